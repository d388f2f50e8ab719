#pragma once

// A private ODBC set-up for tests: unixODBC reads its drivers and system data
// sources from the folder ODBCSYSINI names and user data sources from the file
// ODBCINI names, so nothing of the user's own is read or changed.
#include "erp/democompany.h"
#include "erp/odbc.h"

#include <QDir>
#include <QFile>
#include <QTemporaryDir>
#include <QTextStream>

#include <memory>

struct OdbcSandbox {
    QTemporaryDir dir;
    QString iniText;

    OdbcSandbox()
    {
        QFile::copy(QStringLiteral("/etc/odbcinst.ini"), dir.filePath(QStringLiteral("odbcinst.ini")));
        qputenv("ODBCSYSINI", dir.path().toUtf8());
        qputenv("ODBCINI", dir.filePath(QStringLiteral("user-odbc.ini")).toUtf8());
    }

    // Adds a system data source with the given attributes and writes odbc.ini.
    void addDsn(const QString& name, const QList<std::pair<QString, QString>>& attributes)
    {
        iniText += QLatin1Char('[') + name + QStringLiteral("]\n");
        for (const auto& [k, v] : attributes)
            iniText += k + QLatin1Char('=') + v + QLatin1Char('\n');
        QFile f(dir.filePath(QStringLiteral("odbc.ini")));
        f.open(QIODevice::WriteOnly | QIODevice::Truncate);
        f.write(iniText.toUtf8());
    }

    // A demo company of the given connection type behind a new data source.
    QString addDemo(const QString& name, const tagora::DemoOptions& options)
    {
        const QString path = dir.filePath(name + QStringLiteral(".sqlite"));
        const tagora::DbError e = tagora::CreateDemoErp(path, options);
        if (e)
            qFatal("demo company: %s", qPrintable(e.message));
        addDsn(name, {{QStringLiteral("Driver"), QStringLiteral("SQLite3")}, {QStringLiteral("Database"), path}});
        return path;
    }
};

// A connection opened on `text`, or null with the driver's message in error.
inline std::unique_ptr<tagora::ErpConnection> openErp(const QString& text, QString* error, int seconds = 30)
{
    auto c = std::make_unique<tagora::ErpConnection>();
    return c->open(text, seconds, error) ? std::move(c) : nullptr;
}

// The first value of a query's first row; invalid when there is none.
inline QVariant firstValue(tagora::ErpConnection& c, const QString& sql, QString* error)
{
    auto rs = c.query(sql, error);
    return rs && rs->next() ? rs->value(0) : QVariant();
}
