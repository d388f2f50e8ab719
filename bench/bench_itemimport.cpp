// Item import speed: the demo company at benchmark size, read through the
// SQLite ODBC driver into the items database as the import does it, against
// the floor of the sqlite3 shell copying the same rows from the same file
// into empty tables (INSERT ... SELECT through ATTACH), measured in the same run.
//
//   bench_itemimport [ITEMS]          the benchmark (100,000 items by default)
//   bench_itemimport --make-demo DIR ITEMS
//   bench_itemimport --import DIR     the steps it runs as child processes
//
// The demo company is made first, in a child process of its own, before any
// timing; then the import (each time in a child process, into fresh local
// databases) and the floor (the sqlite3 shell) run five times, one after the
// other. Each child's peak RSS is read from wait4(), so the import's figure is
// the import's alone, not the generator's nor this process's.
#include "erp/connparams.h"
#include "erp/democompany.h"
#include "erp/itemimport.h"
#include "localdb/database.h"
#include "localdb/schema.h"
#include "benchchild.h"

#include <QCoreApplication>
#include <QElapsedTimer>
#include <QFile>
#include <QStandardPaths>
#include <QTemporaryDir>

#include <algorithm>
#include <cstdio>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <spawn.h>
#include <string>
#include <sys/resource.h>
#include <sys/wait.h>
#include <vector>


using namespace tagora;
using namespace benchchild;

namespace {

constexpr int kRuns = 5;
const char* const kDsn = "BenchErp";

// ------------------------------------------------------------- the children

// --import DIR: the import of the company at DIR into fresh local databases
// in a new folder under DIR, removed after. Prints one line for the parent:
// IMPORT seconds=... steps=s1,...,s5 rss=k1,...,k5 items=...
// (each step's seconds, and the process's peak RSS in KiB after each step).
int importOnce(const QString& dir)
{
    qputenv("ODBCSYSINI", QFile::encodeName(dir));
    QTemporaryDir run(dir + QStringLiteral("/run-XXXXXX"));
    const QString itemsDb = run.filePath(QStringLiteral("tgrmitm.tdb"));
    const QString staging = run.filePath(QStringLiteral("tgrlabti.tmp"));
    DbError de;
    if (CreateItemsDB(itemsDb, &de).isEmpty() || CreateTempItemsDB(staging, itemsDb, &de).isEmpty()) {
        std::fprintf(stderr, "local databases: %s\n", qPrintable(de.message));
        return 1;
    }
    const ErpReadContext ctx{BuildConnString(QLatin1String(kDsn), QStringLiteral("sa"), QVariant(), QString(), 2)};

    // The import: one price list, foreign names, customer part numbers, all price lists, merged.
    ReadError e;
    std::vector<double> steps;
    std::vector<long> peaks;
    QElapsedTimer t, step;
    auto timed = [&](bool ok) {
        steps.push_back(step.nsecsElapsed() / 1e9);
        rusage usage{};
        getrusage(RUSAGE_SELF, &usage);
        peaks.push_back(usage.ru_maxrss);
        step.restart();
        return ok;
    };
    t.start();
    step.start();
    const bool ok = timed(ReadItemPriority(ctx, itemsDb, {}, {}, false, 1, 1, false, false, &e))
        && timed(ReadItemFName(ctx, itemsDb, {}, {}, false, &e))
        && timed(ReadAlterKeyPRIORITY(ctx, staging, false, QStringLiteral("tTempAlterKeys"), &e))
        && timed(ReadPriceListPriority(ctx, staging, {}, {}, false, QStringLiteral("tTempPriceList"), &e))
        && timed(UpdateMainItemTables(staging, &e.message));
    const double seconds = t.nsecsElapsed() / 1e9;
    if (!ok) {
        std::fprintf(stderr, "import failed: %s %s\n", qPrintable(e.title), qPrintable(e.message));
        return 1;
    }
    Database items;
    long long count = -1;
    if (!items.open(itemsDb, Database::OpenMode::ReadOnly))
        count = items.scalar(QStringLiteral("SELECT count(*) FROM tItems")).toLongLong();
    std::printf("IMPORT seconds=%.6f steps=%.6f,%.6f,%.6f,%.6f,%.6f rss=%ld,%ld,%ld,%ld,%ld items=%lld\n", seconds,
                steps[0], steps[1], steps[2], steps[3], steps[4], peaks[0], peaks[1], peaks[2], peaks[3], peaks[4],
                count);
    return 0;
}

// --------------------------------------------------------------- the parent

long long count(const QString& db, const QString& sql)
{
    Database d;
    d.open(db, Database::OpenMode::ReadOnly);
    return d.scalar(sql).toLongLong();
}

int bench(int items)
{
    const QString self = QCoreApplication::applicationFilePath();
    QTemporaryDir tmp;
    if (!tmp.isValid()) {
        std::fprintf(stderr, "no temporary folder: %s\n", qPrintable(tmp.errorString()));
        return 1;
    }
    const QString dir = tmp.path();
    const Child demo = prepareDemo(self, dir, kDsn, items);
    if (!demo.ok)
        return 1;
    std::printf("item import: %d items\n", items);
    std::printf("  demo company made beforehand: %.2f s, peak RSS %s MiB (its own process)\n", demo.seconds,
                qPrintable(mib(demo.maxRssKiB)));

    // The floor: the same four result sets copied by the sqlite3 shell.
    const QString shell = QStandardPaths::findExecutable(QStringLiteral("sqlite3"));
    if (shell.isEmpty()) {
        std::fprintf(stderr, "no sqlite3 shell on the PATH\n");
        return 1;
    }
    const QString floorDb = dir + QStringLiteral("/floor.db");
    const QString floorScript = dir + QStringLiteral("/floor.sql");
    {
        // The shell takes no bound values: the bench's own numbers go in as literals.
        auto literal = [](const ErpQuery& q) { return ErpConnection::inlineSqliteValues(q.sql, q.params); };
        const QStringList queries = {
            literal(itemQuerySql({}, {}, false, 1, false, {})),
            literal(foreignNameQuerySql({}, {}, {})),
            literal(alterKeyQuerySql(false, {})),
            literal(priceListQuerySql({}, {}, {})),
        };
        QString statements;
        for (int i = 0; i < queries.size(); ++i)
            statements += QStringLiteral("CREATE TABLE t%1 AS %2 LIMIT 0;\nINSERT INTO t%1 %2;\n").arg(i).arg(queries[i]);
        if (!writeFloorScript(floorScript, erpPath(dir), statements))
            return 1;
    }

    // Five rounds: the import in a child process of its own, then the floor.
    const QString importOut = dir + QStringLiteral("/import.out");
    std::vector<double> imports, floors, ratios, rss, floorRss;
    std::vector<std::vector<double>> steps(5), stepRss(5);
    long long rows = 0, imported = 0;
    for (int run = 0; run < kRuns; ++run) {
        const Child im = runChild(self, {QStringLiteral("--import"), dir}, {}, importOut);
        QFile out(importOut);
        const QString line = out.open(QIODevice::ReadOnly) ? QString::fromUtf8(out.readAll()).trimmed() : QString();
        const double importSeconds = field(line, QStringLiteral("seconds")).toDouble();
        const QStringList stepSeconds = field(line, QStringLiteral("steps")).split(QLatin1Char(','));
        const QStringList stepPeaks = field(line, QStringLiteral("rss")).split(QLatin1Char(','));
        if (!im.ok || importSeconds <= 0 || stepSeconds.size() != 5 || stepPeaks.size() != 5) {
            std::fprintf(stderr, "import run %d failed\n", run + 1);
            return 1;
        }
        imported = field(line, QStringLiteral("items")).toLongLong();
        for (int s = 0; s < 5; ++s) {
            steps[size_t(s)].push_back(stepSeconds[s].toDouble());
            stepRss[size_t(s)].push_back(stepPeaks[s].toDouble());
        }

        QFile::remove(floorDb);
        const Child fl = runChild(shell, {floorDb}, floorScript);
        if (!fl.ok) {
            std::fprintf(stderr, "sqlite3 shell failed in run %d\n", run + 1);
            return 1;
        }
        if (run == 0)
            for (int i = 0; i < 4; ++i)
                rows += count(floorDb, QStringLiteral("SELECT count(*) FROM t%1").arg(i));
        imports.push_back(importSeconds);
        floors.push_back(fl.seconds);
        ratios.push_back(importSeconds / fl.seconds);
        rss.push_back(double(im.maxRssKiB));
        floorRss.push_back(double(fl.maxRssKiB));
    }

    // Both read the same four result sets; the import also converts and writes them.
    const Spread im = spread(imports), fl = spread(floors), r = spread(ratios), m = spread(rss), fm = spread(floorRss);
    std::printf("  %lld rows read (%lld items imported), median of %d [min-max]:\n", rows, imported, kRuns);
    std::printf("  import through ODBC  %.2f s [%.2f-%.2f]  %.0f rows/s\n", im.median, im.min, im.max, rows / im.median);
    const char* names[] = {"items, price list 1", "foreign names", "customer part numbers", "all price lists", "merge"};
    for (size_t s = 0; s < 5; ++s) {
        const Spread p = spread(steps[s]);
        std::printf("    %-22s %.2f s [%.2f-%.2f]  peak RSS so far %s MiB\n", names[s], p.median, p.min, p.max,
                    qPrintable(mib(spread(stepRss[s]).median)));
    }
    std::printf("  sqlite3 shell floor  %.2f s [%.2f-%.2f]  %.0f rows/s\n", fl.median, fl.min, fl.max, rows / fl.median);
    std::printf("  ratio                %.2f [%.2f-%.2f] times the floor (run by run)\n", r.median, r.min, r.max);
    std::printf("  peak RSS, the import alone: %s MiB [%s-%s]  (the shell's: %s MiB)\n", qPrintable(mib(m.median)),
                qPrintable(mib(m.min)), qPrintable(mib(m.max)), qPrintable(mib(fm.median)));
    std::printf("RESULT bench=itemimport items=%d rows=%lld import_s=%.3f floor_s=%.3f ratio=%.3f ratio_min=%.3f "
                "ratio_max=%.3f import_rss_kib=%.0f import_rss_max_kib=%.0f demo_s=%.2f demo_rss_kib=%ld\n",
                items, rows, im.median, fl.median, r.median, r.min, r.max, m.median, m.max, demo.seconds,
                demo.maxRssKiB);
    return 0;
}

} // namespace

int main(int argc, char** argv)
{
    QCoreApplication app(argc, argv);
    const QStringList args = app.arguments();
    if (args.size() == 4 && args[1] == QLatin1String("--make-demo"))
        return makeDemo(args[2], args[3].toInt());
    if (args.size() == 3 && args[1] == QLatin1String("--import"))
        return importOnce(args[2]);
    const int items = args.size() > 1 ? args[1].toInt() : 100000;
    if (items < 10) {
        std::fprintf(stderr, "usage: bench_itemimport [ITEMS (10 or more)]\n");
        return 2;
    }
    return bench(items);
}
