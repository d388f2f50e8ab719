// Document import speed: customer orders, delivery notes and tax invoices of
// the demo company (every one of the three joins its customer and takes the
// customer's consolidating account), drafts included and the dates open to
// the far future, read through the SQLite ODBC driver into the temporary
// documents database as the import does it, against the floor of the sqlite3
// shell copying the same header and line rows from the same file into empty
// tables (INSERT ... SELECT through ATTACH), measured in the same run.
//
// The import reads each header's lines with a query of its own. Two more
// children measure what those queries cost: one sends only the header
// queries and fetches their rows, one sends the header queries and, for every
// header, its line query, fetching every row, both writing nothing. The
// difference is the time of the per-header line queries; a third child
// fetches the same lines with one query a type, for comparison.
//
//   bench_docimport [ITEMS]           the benchmark (133,000 items: about 10,000 documents)
//   bench_docimport --make-demo DIR ITEMS
//   bench_docimport --import DIR
//   bench_docimport --reads DIR headers|lines|joined   the steps it runs as child processes
#include "erp/connparams.h"
#include "erp/democompany.h"
#include "erp/docimport.h"
#include "erp/odbc.h"
#include "localdb/database.h"
#include "localdb/schema.h"
#include "benchchild.h"

#include <QCoreApplication>
#include <QDir>
#include <QElapsedTimer>
#include <QFile>
#include <QStandardPaths>
#include <QTemporaryDir>

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


using namespace tagora;
using namespace benchchild;

namespace {

constexpr int kRuns = 5;
const char* const kDsn = "BenchErp";
// Orders, delivery notes, invoices: the customer types, each 8 + items/40 documents.
const char* const kTypes = "1, 3, 5";
const QString kFromDate = QStringLiteral("1/1/2000");
const QString kToDate = QStringLiteral("31/12/2079");

QString connString()
{
    return BuildConnString(QLatin1String(kDsn), QStringLiteral("sa"), QVariant(), QString(), 2);
}

// A data folder with the supplied configuration, the three types included
// with their drafts and every range at its start.
bool makeDataFolder(const QString& folder)
{
    DbError e = PrepareDataFolder(folder);
    Database config;
    if (!e)
        e = config.open(QDir(folder).filePath(dbfiles::Config));
    if (!e)
        e = config.exec(QStringLiteral("UPDATE tDocTypes SET Include = (DocType IN (%1)), IncludeDraft = (DocType IN (%1))")
                            .arg(QLatin1String(kTypes)));
    if (e) {
        std::fprintf(stderr, "data folder: %s\n", qPrintable(e.message));
        return false;
    }
    return true;
}

// The included types' recipes, through a temporary documents database of the folder.
QVector<DocTypeRecipe> recipes(const QString& folder)
{
    const QDir d(folder);
    DbError e;
    const QString temp = CreateTempDocsDB(d.filePath(dbfiles::Config), d.filePath(dbfiles::Items),
                                          d.filePath(dbfiles::TempDocs), &e);
    Database db;
    if (!temp.isEmpty())
        e = db.open(temp);
    QVector<DocTypeRecipe> types;
    if (!e)
        types = ReadDocTypes(db, &e);
    if (e)
        std::fprintf(stderr, "document types: %s\n", qPrintable(e.message));
    return types;
}

// The header selection of a type as the import makes it on a fresh folder.
ErpQuery criteriaOf(const DocTypeRecipe& r)
{
    return BuildDocRangeCriteria(r, QDate(2000, 1, 1), QDate(2079, 12, 31), QString(), QString(), 0, r.includeDraft,
                                 QStringLiteral("%"), 2);
}

// ------------------------------------------------------------- the children

// --import DIR: the whole import into a new data folder under DIR, removed
// after. Prints one line for the parent: IMPORT seconds=... headers=... lines=...
int importOnce(const QString& dir)
{
    qputenv("ODBCSYSINI", QFile::encodeName(dir));
    QTemporaryDir run(dir + QStringLiteral("/run-XXXXXX"));
    const QString folder = run.filePath(QStringLiteral("data"));
    if (!makeDataFolder(folder))
        return 1;
    DocImportOptions o;
    o.dataFolder = folder;
    o.fromDate = kFromDate;
    o.toDate = kToDate;
    const ErpReadContext ctx{connString()};
    QElapsedTimer t;
    t.start();
    const DocImportResult r = ImportDocuments(ctx, o, nullptr);
    const double seconds = t.nsecsElapsed() / 1e9;
    if (!r.completed || !r.errors.isEmpty()) {
        const ReadError e = r.errors.value(0);
        std::fprintf(stderr, "import failed: %s %s\n", qPrintable(e.title), qPrintable(e.message));
        return 1;
    }
    Database docs;
    if (docs.open(r.tempDocsPath, Database::OpenMode::ReadOnly))
        return 1;
    std::printf("IMPORT seconds=%.6f headers=%lld lines=%lld\n", seconds,
                docs.scalar(QStringLiteral("SELECT count(*) FROM tTempDocHeaders")).toLongLong(),
                docs.scalar(QStringLiteral("SELECT count(*) FROM tTempDocLines")).toLongLong());
    return 0;
}

// --reads DIR MODE: the import's ERP reads alone, nothing written. headers:
// the header queries; lines: each header's line query as well, as the import
// sends it; joined: one line query a type over all its headers.
// Prints READS seconds=... headers=... lines=...
int readsOnce(const QString& dir, const QString& mode)
{
    qputenv("ODBCSYSINI", QFile::encodeName(dir));
    QTemporaryDir run(dir + QStringLiteral("/reads-XXXXXX"));
    const QString folder = run.filePath(QStringLiteral("data"));
    if (!makeDataFolder(folder))
        return 1;
    const QVector<DocTypeRecipe> types = recipes(folder);
    if (types.isEmpty())
        return 1;
    QString error;
    ErpConnection erp, erpLines;
    if (!erp.open(connString(), 60, &error) || !erpLines.open(connString(), 60, &error)) {
        std::fprintf(stderr, "connection: %s\n", qPrintable(error));
        return 1;
    }
    long long headers = 0, lines = 0;
    auto drain = [&](std::unique_ptr<ErpRecordset> rs, long long* rows) {
        if (!rs)
            return false;
        while (rs->next())
            ++*rows;
        if (rs->failed())
            error = rs->error();
        return !rs->failed();
    };
    QElapsedTimer t;
    t.start();
    for (const DocTypeRecipe& r : types) {
        const ErpQuery criteria = criteriaOf(r);
        auto rs = erp.query(docHeaderSql(r, QtyLine, criteria), &error);
        if (!rs)
            break;
        while (rs->next()) {
            ++headers;
            if (mode == QLatin1String("lines")
                && !drain(erpLines.query(docLineSql(r, QtyLine, rs->value(QStringLiteral("ID")).toLongLong()), &error),
                          &lines))
                break;
        }
        if (rs->failed())
            error = rs->error();
        if (!error.isEmpty())
            break;
        if (mode == QLatin1String("joined")) {
            const ErpQuery one = docLineSql(r, QtyLine, 0);
            const ErpQuery ids = docHeaderSql(r, QtyLine, criteria);
            const QString sql = QString(one.sql).replace(
                QStringLiteral(" = ? ORDER BY"), QStringLiteral(" IN (SELECT ID FROM (%1) h) ORDER BY").arg(ids.sql));
            if (!drain(erpLines.query(sql, ids.params, &error), &lines))
                break;
        }
    }
    const double seconds = t.nsecsElapsed() / 1e9;
    if (!error.isEmpty()) {
        std::fprintf(stderr, "reads failed: %s\n", qPrintable(error));
        return 1;
    }
    std::printf("READS seconds=%.6f headers=%lld lines=%lld\n", seconds, headers, lines);
    return 0;
}

// --------------------------------------------------------------- the parent

// A child's one line of figures, or empty when it failed.
QString runForLine(const QString& self, const QStringList& args, const QString& outFile, Child* child)
{
    *child = runChild(self, args, {}, outFile);
    QFile out(outFile);
    const QString line = out.open(QIODevice::ReadOnly) ? QString::fromUtf8(out.readAll()).trimmed() : QString();
    return child->ok && field(line, QStringLiteral("seconds")).toDouble() > 0 ? line : QString();
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
    std::printf("document import: demo company of %d items, types %s with drafts, dates %s-%s\n", items, kTypes,
                qPrintable(kFromDate), qPrintable(kToDate));
    std::printf("  demo company made beforehand: %.2f s, peak RSS %s MiB (its own process)\n", demo.seconds,
                qPrintable(mib(demo.maxRssKiB)));

    // The floor: each type's header rows, then all their lines in one query.
    const QString shell = QStandardPaths::findExecutable(QStringLiteral("sqlite3"));
    if (shell.isEmpty()) {
        std::fprintf(stderr, "no sqlite3 shell on the PATH\n");
        return 1;
    }
    const QString floorDb = dir + QStringLiteral("/floor.db");
    const QString floorScript = dir + QStringLiteral("/floor.sql");
    const QString recipeFolder = dir + QStringLiteral("/recipes");
    if (!makeDataFolder(recipeFolder))
        return 1;
    const QVector<DocTypeRecipe> types = recipes(recipeFolder);
    if (types.isEmpty())
        return 1;
    {
        // The shell takes no bound values: the bench's own numbers go in as literals.
        QString statements;
        for (const DocTypeRecipe& r : types) {
            const ErpQuery h = docHeaderSql(r, QtyLine, criteriaOf(r));
            const QString head = ErpConnection::inlineSqliteValues(h.sql, h.params);
            const QString line = docLineSql(r, QtyLine, 0).sql.replace(
                QStringLiteral(" = ? ORDER BY"), QStringLiteral(" IN (SELECT ID FROM h%1) ORDER BY").arg(r.docType));
            statements += QStringLiteral("CREATE TABLE h%1 AS %2 LIMIT 0;\nINSERT INTO h%1 %2;\n"
                                         "CREATE TABLE l%1 AS %3 LIMIT 0;\nINSERT INTO l%1 %3;\n")
                              .arg(r.docType)
                              .arg(head, line);
        }
        if (!writeFloorScript(floorScript, erpPath(dir), statements))
            return 1;
    }

    // Five rounds: the import, the floor, then the reads alone, each in a process of its own.
    const QString out = dir + QStringLiteral("/child.out");
    const QStringList modes = {QStringLiteral("headers"), QStringLiteral("lines"), QStringLiteral("joined")};
    std::vector<double> imports, floors, ratios, rss, floorRss, shares;
    std::vector<std::vector<double>> reads(size_t(modes.size()));
    long long headers = 0, lines = 0, floorHeaders = 0, floorLines = 0;
    for (int run = 0; run < kRuns; ++run) {
        Child im;
        const QString line = runForLine(self, {QStringLiteral("--import"), dir}, out, &im);
        if (line.isEmpty()) {
            std::fprintf(stderr, "import run %d failed\n", run + 1);
            return 1;
        }
        const double importSeconds = field(line, QStringLiteral("seconds")).toDouble();
        headers = field(line, QStringLiteral("headers")).toLongLong();
        lines = field(line, QStringLiteral("lines")).toLongLong();

        QFile::remove(floorDb);
        const Child fl = runChild(shell, {floorDb}, floorScript);
        if (!fl.ok) {
            std::fprintf(stderr, "sqlite3 shell failed in run %d\n", run + 1);
            return 1;
        }
        if (run == 0) {
            Database d;
            d.open(floorDb, Database::OpenMode::ReadOnly);
            for (const DocTypeRecipe& r : types) {
                floorHeaders += d.scalar(QStringLiteral("SELECT count(*) FROM h%1").arg(r.docType)).toLongLong();
                floorLines += d.scalar(QStringLiteral("SELECT count(*) FROM l%1").arg(r.docType)).toLongLong();
            }
        }

        std::vector<double> modeSeconds;
        for (int m = 0; m < modes.size(); ++m) {
            Child rd;
            const QString readLine = runForLine(self, {QStringLiteral("--reads"), dir, modes[m]}, out, &rd);
            if (readLine.isEmpty()) {
                std::fprintf(stderr, "reads (%s) run %d failed\n", qPrintable(modes[m]), run + 1);
                return 1;
            }
            modeSeconds.push_back(field(readLine, QStringLiteral("seconds")).toDouble());
            reads[size_t(m)].push_back(modeSeconds.back());
        }
        imports.push_back(importSeconds);
        floors.push_back(fl.seconds);
        ratios.push_back(importSeconds / fl.seconds);
        rss.push_back(double(im.maxRssKiB));
        floorRss.push_back(double(fl.maxRssKiB));
        shares.push_back((modeSeconds[1] - modeSeconds[0]) / importSeconds);
    }

    const Spread im = spread(imports), fl = spread(floors), r = spread(ratios), m = spread(rss), fm = spread(floorRss);
    const Spread hd = spread(reads[0]), ln = spread(reads[1]), jn = spread(reads[2]), sh = spread(shares);
    const Spread perHeader = spread([&] {
        std::vector<double> v;
        for (int i = 0; i < kRuns; ++i)
            v.push_back(reads[1][size_t(i)] - reads[0][size_t(i)]);
        return v;
    }());
    std::printf("  %lld documents, %lld lines imported (the floor copies %lld and %lld rows); median of %d [min-max]:\n",
                headers, lines, floorHeaders, floorLines, kRuns);
    std::printf("  import through ODBC  %.2f s [%.2f-%.2f]  %.0f documents/s\n", im.median, im.min, im.max,
                headers / im.median);
    std::printf("  sqlite3 shell floor  %.2f s [%.2f-%.2f]\n", fl.median, fl.min, fl.max);
    std::printf("  ratio                %.1f [%.1f-%.1f] times the floor (run by run)\n", r.median, r.min, r.max);
    std::printf("  the import's ERP reads alone, nothing written:\n");
    std::printf("    header queries                       %.2f s [%.2f-%.2f]\n", hd.median, hd.min, hd.max);
    std::printf("    and a line query for each header     %.2f s [%.2f-%.2f]\n", ln.median, ln.min, ln.max);
    std::printf("    and one line query for each type     %.2f s [%.2f-%.2f]\n", jn.median, jn.min, jn.max);
    std::printf("  the per-header line queries: %.2f s [%.2f-%.2f], %.0f%% [%.0f-%.0f] of the import (run by run)\n",
                perHeader.median, perHeader.min, perHeader.max, sh.median * 100, sh.min * 100, sh.max * 100);
    std::printf("  peak RSS, the import alone: %s MiB [%s-%s]  (the shell's: %s MiB)\n", qPrintable(mib(m.median)),
                qPrintable(mib(m.min)), qPrintable(mib(m.max)), qPrintable(mib(fm.median)));
    std::printf("RESULT bench=docimport items=%d documents=%lld lines=%lld import_s=%.3f floor_s=%.3f ratio=%.3f "
                "ratio_min=%.3f ratio_max=%.3f headers_read_s=%.3f lines_read_s=%.3f joined_read_s=%.3f "
                "line_queries_share=%.3f import_rss_kib=%.0f import_rss_max_kib=%.0f demo_s=%.2f demo_rss_kib=%ld\n",
                items, headers, lines, im.median, fl.median, r.median, r.min, r.max, hd.median, ln.median, jn.median,
                sh.median, m.median, m.max, demo.seconds, demo.maxRssKiB);
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
    if (args.size() == 4 && args[1] == QLatin1String("--reads"))
        return readsOnce(args[2], args[3]);
    const int items = args.size() > 1 ? args[1].toInt() : 133000;
    if (items < 10) {
        std::fprintf(stderr, "usage: bench_docimport [ITEMS (10 or more)]\n");
        return 2;
    }
    return bench(items);
}
