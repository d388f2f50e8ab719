// Item import speed: the demo company at benchmark size, read through the
// SQLite ODBC driver into the items database as the import does it, against
// the floor of the sqlite3 shell copying the same rows from the same file
// into empty tables (INSERT ... SELECT through ATTACH), measured in the same run.
#include "erp/connparams.h"
#include "erp/democompany.h"
#include "erp/itemimport.h"
#include "localdb/database.h"
#include "localdb/schema.h"

#include <QCoreApplication>
#include <QElapsedTimer>
#include <QFile>
#include <QProcess>
#include <QStandardPaths>
#include <QTemporaryDir>
#include <cstdio>

using namespace tagora;

namespace {
long long count(const QString& db, const QString& sql)
{
    Database d;
    d.open(db);
    return d.scalar(sql).toLongLong();
}
} // namespace

int main(int argc, char** argv)
{
    QCoreApplication app(argc, argv);
    const int items = argc > 1 ? QString::fromLocal8Bit(argv[1]).toInt() : 100000;
    QTemporaryDir dir;
    QFile::copy(QStringLiteral("/etc/odbcinst.ini"), dir.filePath(QStringLiteral("odbcinst.ini")));
    qputenv("ODBCSYSINI", dir.path().toUtf8());
    const QString erp = dir.filePath(QStringLiteral("erp.sqlite"));
    {
        QFile ini(dir.filePath(QStringLiteral("odbc.ini")));
        ini.open(QIODevice::WriteOnly);
        ini.write(QStringLiteral("[BenchErp]\nDriver=SQLite3\nDatabase=%1\n").arg(erp).toUtf8());
    }
    DemoOptions options;
    options.items = items;
    options.connType = 2;
    QElapsedTimer t;
    t.start();
    if (const DbError e = CreateDemoErp(erp, options)) {
        std::fprintf(stderr, "demo company: %s\n", qPrintable(e.message));
        return 1;
    }
    std::printf("demo company: %d items in %.2f s\n", items, t.elapsed() / 1000.0);

    // The import: one price list, foreign names, customer part numbers, all price lists, merged.
    const QString itemsDb = dir.filePath(QStringLiteral("tgrmitm.tdb"));
    const QString staging = dir.filePath(QStringLiteral("tgrlabti.tmp"));
    DbError de;
    CreateItemsDB(itemsDb, &de);
    CreateTempItemsDB(staging, itemsDb, &de);
    const ErpReadContext ctx{BuildConnString(QStringLiteral("BenchErp"), QStringLiteral("sa"), QVariant(), QString(), 2)};
    ReadError e;
    QElapsedTimer step;
    auto timed = [&](const char* name, bool ok) {
        std::printf("  %-28s %.2f s\n", name, step.restart() / 1000.0);
        return ok;
    };
    t.restart();
    step.start();
    const bool ok = timed("items, price list 1", ReadItemPriority(ctx, itemsDb, {}, {}, false, 1, 1, false, false, &e))
        && timed("foreign names", ReadItemFName(ctx, itemsDb, {}, {}, false, &e))
        && timed("customer part numbers", ReadAlterKeyPRIORITY(ctx, staging, false, QStringLiteral("tTempAlterKeys"), &e))
        && timed("all price lists", ReadPriceListPriority(ctx, staging, {}, {}, false, QStringLiteral("tTempPriceList"), &e))
        && timed("merge", UpdateMainItemTables(staging, &e.message));
    const double importSeconds = t.elapsed() / 1000.0;
    if (!ok) {
        std::fprintf(stderr, "import failed: %s %s\n", qPrintable(e.title), qPrintable(e.message));
        return 1;
    }

    // The floor: the same four result sets copied by the sqlite3 shell.
    const QString shell = QStandardPaths::findExecutable(QStringLiteral("sqlite3"));
    const QString floorDb = dir.filePath(QStringLiteral("floor.db"));
    QString script = QStringLiteral("ATTACH '%1' AS e;\nBEGIN;\n").arg(erp);
    // The shell takes no bound values; these are the bench's own numbers.
    auto literal = [](ErpQuery q) {
        for (const QVariant& v : q.params)
            q.sql.replace(q.sql.indexOf(QLatin1Char('?')), 1, v.toString());
        return q.sql;
    };
    const QStringList queries = {
        literal(itemQuerySql({}, {}, false, 1, false, {})),
        literal(foreignNameQuerySql({}, {}, {})),
        literal(alterKeyQuerySql(false, {})),
        literal(priceListQuerySql({}, {}, {})),
    };
    for (int i = 0; i < queries.size(); ++i)
        script += QStringLiteral("CREATE TABLE t%1 AS %2 LIMIT 0;\nINSERT INTO t%1 %2;\n").arg(i).arg(queries[i]);
    script += QStringLiteral("COMMIT;\n");
    QProcess p;
    t.restart();
    p.start(shell, {floorDb});
    p.write(script.toUtf8());
    p.closeWriteChannel();
    p.waitForFinished(-1);
    const double floorSeconds = t.elapsed() / 1000.0;
    if (p.exitCode() != 0) {
        std::fprintf(stderr, "sqlite3 shell failed: %s\n", p.readAllStandardError().constData());
        return 1;
    }
    long long floorRows = 0;
    for (int i = 0; i < queries.size(); ++i)
        floorRows += count(floorDb, QStringLiteral("SELECT count(*) FROM t%1").arg(i));

    // Both read the same four result sets; the import also converts and writes them.
    const long long rowsRead = floorRows;
    std::printf("import through ODBC: %lld rows in %.2f s = %.0f rows/s\n", rowsRead, importSeconds, rowsRead / importSeconds);
    std::printf("sqlite3 shell floor: %lld rows in %.2f s = %.0f rows/s\n", floorRows, floorSeconds, floorRows / floorSeconds);
    std::printf("ratio (floor speed / import speed): %.2f\n", (floorRows / floorSeconds) / (rowsRead / importSeconds));
    return 0;
}
