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
        p.start(psql, {"-h", "127.0.0.1", "-p", port, "-U", "postgres", "-d", "postgres", "-q", "-v", "ON_ERROR_STOP=1",
                       "-c", "CREATE SEQUENCE IF NOT EXISTS tagora_probe_seq"});
        QVERIFY(p.waitForFinished(60000));
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
        // Literals pass unchanged to a server that knows them.
        auto rs = c.query("SELECT count(*) FROM PART WHERE PARTDES <> N'x'", &e);
        QVERIFY2(rs && rs->next(), qPrintable(e));
    }

    // Every write form is refused and the ERP's rows stay.
    void writesRefused_data()
    {
        QTest::addColumn<QString>("sql");
        QTest::newRow("create table") << "CREATE TABLE tagora_probe (a int)";
        QTest::newRow("delete in a common table") << "WITH d AS (DELETE FROM PART RETURNING 1) SELECT count(*) FROM d";
        QTest::newRow("delete after a common table") << "WITH x AS (SELECT 1) DELETE FROM PART";
        QTest::newRow("second statement") << "SELECT 1; UPDATE PART SET PARTDES = 'x'";
        QTest::newRow("select into") << "SELECT * INTO tagora_copy FROM PART";
        QTest::newRow("row locks") << "SELECT PARTNAME FROM PART FOR UPDATE";
    }
    void writesRefused()
    {
        QFETCH(QString, sql);
        ErpConnection c;
        QString e;
        QVERIFY2(c.open(BuildConnString("TagoraPg", "postgres", QVariant(), "", 2), 10, &e), qPrintable(e));
        const QString rows = "SELECT count(*), count(DISTINCT PARTDES) FROM PART";
        auto rs = c.query(rows, &e);
        QVERIFY2(rs && rs->next(), qPrintable(e));
        const QVariantList before{rs->value(0), rs->value(1)};
        rs.reset();
        QVERIFY(!c.query(sql, &e));
        rs = c.query(rows, &e);
        QVERIFY2(rs && rs->next(), qPrintable(e));
        QCOMPARE((QVariantList{rs->value(0), rs->value(1)}), before);
        rs = c.query("SELECT count(*) FROM information_schema.tables WHERE table_name IN ('tagora_probe', 'tagora_copy')", &e);
        QVERIFY2(rs && rs->next(), qPrintable(e));
        QCOMPARE(rs->value(0).toLongLong(), 0LL);
    }

    // The session itself is read only: a write the guard cannot see (a
    // function that changes a sequence) is refused by the server.
    void sessionReadOnly()
    {
        ErpConnection c;
        QString e;
        QVERIFY2(c.open(BuildConnString("TagoraPg", "postgres", QVariant(), "", 2), 10, &e), qPrintable(e));
        auto rs = c.query("SELECT current_setting('transaction_read_only')", &e);
        QVERIFY2(rs && rs->next(), qPrintable(e));
        QCOMPARE(rs->value(0).toString(), QString("on"));
        rs = c.query("SELECT nextval('tagora_probe_seq')", &e);
        QVERIFY(!rs || !rs->next());
        QVERIFY2(e.contains("read-only") || (rs && rs->error().contains("read-only")), qPrintable(e));
    }

    // A driver that reads braces keeps getting them: such a password connects.
    void bracedValuesConnect()
    {
        ErpConnection c;
        QString e;
        QVERIFY2(c.open(BuildConnString("TagoraPg", "postgres", QVariant("x;y}{ "), "", 2), 10, &e), qPrintable(e));
    }

    // A table locked by another session: the reader's count and its query
    // share the reader's time-out, and the reader ends with the server's message.
    void lockedTableEndsWithMessage()
    {
        QProcess holder;
        holder.start(QStandardPaths::findExecutable("psql"),
                     {"-h", "127.0.0.1", "-p", port, "-U", "postgres", "-d", "postgres", "-q", "-t", "-A"});
        QVERIFY(holder.waitForStarted());
        holder.write("BEGIN; LOCK TABLE PART IN ACCESS EXCLUSIVE MODE; SELECT 'held';\n");
        while (!holder.readAllStandardOutput().contains("held"))
            QVERIFY(holder.waitForReadyRead(30000));

        const QString items = work.filePath("locked.tdb");
        DbError de;
        QVERIFY2(!CreateItemsDB(items, &de).isEmpty(), qPrintable(de.message));
        ErpReadContext ctx{BuildConnString("TagoraPg", "postgres", QVariant(), "", 2), nullptr, QString(), today};
        ctx.timeout = 1;
        ReadError e;
        const bool ok = ReadItemPriority(ctx, items, {}, {}, false, 1, 1, false, true, &e);
        holder.write("ROLLBACK;\n");
        holder.closeWriteChannel();
        QVERIFY(holder.waitForFinished(30000));
        QVERIFY(!ok);
        QVERIFY2(e.message.contains("statement timeout") || e.message.contains("cancel"), qPrintable(e.message));
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
