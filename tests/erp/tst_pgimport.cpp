// The item import from a real SQL server: the demo company loaded into
// PostgreSQL, read through its ODBC driver as connection type 2, must give
// the same local tables as the same company read from SQLite.
#include "support/dbrows.h"
#include "support/erpfixture.h"

#include "erp/connparams.h"
#include "erp/itemimport.h"
#include "erp/odbc.h"
#include "localdb/database.h"
#include "localdb/schema.h"

#include <QProcess>
#include <QStandardPaths>
#include <QtTest>

using namespace tagora;


class TestPgImport : public QObject {
    Q_OBJECT
    OdbcSandbox odbc;
    QTemporaryDir work;
    QString port = qEnvironmentVariable("TAGORA_PG_PORT", "54329");
    QDate today = QDate::currentDate();

    // Every reader of the item import into a fresh items database; the tables it leaves.
    QStringList importAll(const QString& dsn, const QString& tag)
    {
        const QString items = work.filePath(tag + ".tdb");
        const QString staging = work.filePath(tag + ".tmp");
        DbError de;
        if (CreateItemsDB(items, &de).isEmpty() || CreateTempItemsDB(staging, items, &de).isEmpty())
            return {de.message};
        const ErpReadContext ctx{BuildConnString(dsn, "postgres", QVariant(), "", 2), nullptr, QString(), today};
        ReadError e;
        const bool ok = ReadItemPriority(ctx, items, {}, {}, false, 1, 1, false, true, &e)
            && ReadItemFName(ctx, items, {}, {}, false, &e)
            && ReadAlterKeyPRIORITY(ctx, staging, false, "tTempAlterKeys", &e)
            && ReadAlterKeySupPRIORITY(ctx, staging, false, "tTempAlterKeys", &e)
            && ReadAlterPricePRIORITY(ctx, staging, false, "tTempAlterPrices", &e)
            && ReadPriceListPriority(ctx, staging, {}, {}, false, "tTempPriceList", &e);
        if (!ok)
            return {e.title + e.message};
        QString merge;
        if (!UpdateMainItemTables(staging, &merge))
            return {merge};
        // Where the ERP holds two rows for one key (a quantity break, a
        // repeated part number) the server's row order decides which is kept,
        // so those values are compared by key alone.
        QStringList out = rows(items, "SELECT ItemKey, ItemName, VNItemName, ItemSort, Unit, BarCode, Local, Fname, "
                                      "Copies, PurPackUN FROM tItems ORDER BY 1");
        for (const char* t : {"tAlterKeys", "tAlterPrices", "tPriceList"})
            out << QStringLiteral("== %1").arg(t) << rows(items, QStringLiteral("SELECT %1 FROM %2 ORDER BY 1, 2")
                                                                     .arg(QLatin1String(qstrcmp(t, "tPriceList") ? "AccountKey, ItemKey" : "ItemKey, PriceList"), QLatin1String(t)));
        return out;
    }

private slots:
    void initTestCase()
    {
        DemoOptions o;
        o.connType = 2;
        o.today = today;
        o.labelLists = false;
        odbc.addDemo("TagoraLite", o);
        const QString script = work.filePath("demo.sql");
        QFile f(script);
        QVERIFY(f.open(QIODevice::WriteOnly));
        f.write(DemoErpScript(o).toUtf8());
        f.close();
        const QString psql = QStandardPaths::findExecutable("psql");
        QVERIFY2(!psql.isEmpty(), "psql is not installed");
        QProcess p;
        p.start(psql, {"-h", "127.0.0.1", "-p", port, "-U", "postgres", "-d", "postgres", "-q", "-v", "ON_ERROR_STOP=1",
                       "-f", script});
        QVERIFY(p.waitForFinished(120000));
        QVERIFY2(p.exitCode() == 0, p.readAllStandardError().constData());
        odbc.addDsn("TagoraPg", {{"Driver", "PostgreSQL Unicode"}, {"Servername", "127.0.0.1"}, {"Port", port},
                                 {"Database", "postgres"}, {"Username", "postgres"}});
    }

    void serverNamesItself()
    {
        ErpConnection c;
        QString e;
        QVERIFY2(c.open(BuildConnString("TagoraPg", "postgres", QVariant(), "", 2), 10, &e), qPrintable(e));
        QCOMPARE(c.dbmsName(), QString("PostgreSQL"));
        QVERIFY(!c.isSqlite());
        // Read only: the system never writes to the ERP.
        auto rs = c.query("CREATE TABLE tagora_probe (a int)", &e);
        QVERIFY(!rs);
        QVERIFY(!e.isEmpty());
        // Literals pass unchanged to a server that knows them.
        rs = c.query("SELECT count(*) FROM PART WHERE PARTDES <> N'x'", &e);
        QVERIFY2(rs && rs->next(), qPrintable(e));
    }

    void sameTablesAsSqlite()
    {
        const QStringList fromPg = importAll("TagoraPg", "pg");
        const QStringList fromLite = importAll("TagoraLite", "lite");
        QVERIFY(fromLite.size() > 100);
        QCOMPARE(fromPg, fromLite);
    }

    void priceFieldsFromServer()
    {
        QString e;
        const auto fields = ReadPriceFields(BuildConnString("TagoraPg", "postgres", QVariant(), "", 2), &e);
        QVERIFY2(e.isEmpty(), qPrintable(e));
        QVERIFY(fields.size() >= 4);
        for (const PriceField& f : fields)
            QVERIFY(f.priceList != -50);
    }
};

QTEST_GUILESS_MAIN(TestPgImport)
#include "tst_pgimport.moc"
