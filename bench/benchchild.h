// What the import benchmarks, which run their work in child processes, share:
// the demo company child, starting a child and reading its own peak memory,
// the median and spread of runs, and the key=value figures a child prints.
#pragma once

#include "erp/democompany.h"
#include "localdb/database.h"

#include <QElapsedTimer>
#include <QFile>
#include <QString>
#include <QStringList>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <spawn.h>
#include <string>
#include <sys/resource.h>
#include <sys/wait.h>
#include <vector>

extern char** environ;

namespace benchchild {

struct Child {
    bool ok = false;
    double seconds = 0; // wall time from start to end
    long maxRssKiB = 0; // the child's own peak, from wait4
};

// Runs program with args, stdin from inFile and stdout to outFile when given,
// and waits for it.
inline Child runChild(const QString& program, const QStringList& args, const QString& inFile = {},
               const QString& outFile = {})
{
    std::vector<std::string> strings{QFile::encodeName(program).toStdString()};
    for (const QString& a : args)
        strings.push_back(QFile::encodeName(a).toStdString());
    std::vector<char*> argv;
    for (std::string& s : strings)
        argv.push_back(s.data());
    argv.push_back(nullptr);
    const std::string in = QFile::encodeName(inFile).toStdString(), out = QFile::encodeName(outFile).toStdString();
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    if (!in.empty())
        posix_spawn_file_actions_addopen(&actions, 0, in.c_str(), O_RDONLY, 0);
    if (!out.empty())
        posix_spawn_file_actions_addopen(&actions, 1, out.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
    Child c;
    QElapsedTimer t;
    t.start();
    pid_t pid = 0;
    const int rc = posix_spawn(&pid, argv[0], &actions, nullptr, argv.data(), environ);
    posix_spawn_file_actions_destroy(&actions);
    if (rc != 0) {
        std::fprintf(stderr, "cannot start %s: %s\n", argv[0], std::strerror(rc));
        return c;
    }
    int status = 0;
    rusage usage{};
    while (wait4(pid, &status, 0, &usage) < 0 && errno == EINTR) {
    }
    c.seconds = t.nsecsElapsed() / 1e9;
    c.maxRssKiB = usage.ru_maxrss;
    c.ok = WIFEXITED(status) && WEXITSTATUS(status) == 0;
    return c;
}

struct Spread {
    double median = 0, min = 0, max = 0;
};

inline Spread spread(std::vector<double> v)
{
    std::sort(v.begin(), v.end());
    return {v[v.size() / 2], v.front(), v.back()};
}

inline QString mib(double kib)
{
    return QString::number(kib / 1024.0, 'f', 1);
}

// The value of key=... on the line.
inline QString field(const QString& line, const QString& key)
{
    for (const QString& part : line.split(QLatin1Char(' '), Qt::SkipEmptyParts))
        if (part.startsWith(key + QLatin1Char('=')))
            return part.mid(key.size() + 1);
    return QString();
}

// A private ODBC set-up in dir (the children find it through ODBCSYSINI):
// the system's drivers and one data source on the ERP file.
inline bool writeOdbcSetup(const QString& dir, const QString& dsn, const QString& erpFile)
{
    QFile::copy(QStringLiteral("/etc/odbcinst.ini"), dir + QStringLiteral("/odbcinst.ini"));
    QFile ini(dir + QStringLiteral("/odbc.ini"));
    if (!ini.open(QIODevice::WriteOnly)
        || ini.write(QStringLiteral("[%1]\nDriver=SQLite3\nDatabase=%2\n").arg(dsn, erpFile).toUtf8()) < 0) {
        std::fprintf(stderr, "cannot write %s\n", qPrintable(ini.fileName()));
        return false;
    }
    return true;
}

// The ERP file of a benchmark's folder.
inline QString erpPath(const QString& dir)
{
    return dir + QStringLiteral("/erp.sqlite");
}

// A folder for one run, its ODBC set-up naming dsn, and the demo company made
// in a child of its own before any timing. The child, with ok false when
// anything failed (the reason is on standard error).
inline Child prepareDemo(const QString& self, const QString& dir, const char* dsn, int items)
{
    if (!writeOdbcSetup(dir, QLatin1String(dsn), erpPath(dir)))
        return Child{};
    return runChild(self, {QStringLiteral("--make-demo"), dir, QString::number(items)});
}

// The floor's script for the sqlite3 shell: the statements copying the ERP's
// result sets, with the ERP attached as "e", in one transaction.
inline bool writeFloorScript(const QString& path, const QString& erpFile, const QString& statements)
{
    QFile f(path);
    const QString script = QStringLiteral("ATTACH '%1' AS e;\nBEGIN;\n").arg(erpFile) + statements
        + QStringLiteral("COMMIT;\n");
    if (!f.open(QIODevice::WriteOnly) || f.write(script.toUtf8()) < 0) {
        std::fprintf(stderr, "cannot write %s\n", qPrintable(path));
        return false;
    }
    return true;
}

// --make-demo DIR ITEMS: the demo company at DIR/erp.sqlite.
inline int makeDemo(const QString& dir, int items)
{
    tagora::DemoOptions options;
    options.items = items;
    options.connType = 2;
    if (const tagora::DbError e = tagora::CreateDemoErp(erpPath(dir), options)) {
        std::fprintf(stderr, "demo company: %s\n", qPrintable(e.message));
        return 1;
    }
    return 0;
}

} // namespace benchchild
