// The item import from a real SQL server: the demo company loaded into
// PostgreSQL, read through its ODBC driver as connection type 2, must give
// the same local tables as the same company read from SQLite. A second copy
// of the company sits in a database whose server reads a backslash inside a
// literal as an escape (standard_conforming_strings off), where doubling
// apostrophes would not keep a value from ending its literal. The document
// import, read from both, must leave the same documents, lines and ranges.
#include "support/dbrows.h"
#include "support/erpfixture.h"

#include "erp/connparams.h"
#include "erp/docimport.h"
#include "erp/itemimport.h"
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
    QString lite;
    int docRuns = 0;

    bool psql(const QStringList& args, QString* error)
    {
        QProcess p;
        p.start(QStandardPaths::findExecutable("psql"),
                QStringList{"-h", "127.0.0.1", "-p", port, "-U", "postgres", "-q", "-v", "ON_ERROR_STOP=1"} + args);
        if (!p.waitForFinished(120000) || p.exitCode() != 0) {
            *error = QString::fromUtf8(p.readAllStandardError());
            return false;
        }
        return true;
    }

    QString pgConn(const QString& dsn) const { return BuildConnString(dsn, "postgres", QVariant(), "", 2); }

    int canaryRows(const QString& dsn)
    {
        if (dsn == "TagoraLite")
            return scalar(lite, "SELECT count(*) FROM canary").toInt();
        QString e;
        const auto c = openErp(pgConn(dsn), &e, 10);
        return c ? firstValue(*c, "SELECT count(*) FROM canary", &e).toInt() : -1;
    }

    // Every reader of the item import into a fresh items database; the tables it leaves.
    QStringList importAll(const QString& dsn, const QString& tag)
    {
        const QString items = work.filePath(tag + ".tdb");
        const QString staging = work.filePath(tag + ".tmp");
        DbError de;
        if (CreateItemsDB(items, &de).isEmpty() || CreateTempItemsDB(staging, items, &de).isEmpty())
            return {de.message};
        const ErpReadContext ctx{pgConn(dsn), nullptr, QString(), today};
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

    // The document import of every type, drafts included, into a new data
    // folder whose recipes the given statement may change first: whether it
    // completed, the titles of its errors (their texts go to messages), then
    // the rows it left.
    QStringList importDocs(const QString& dsn, const QString& tag, DocImportOptions o, const QString& recipeChange,
                           QStringList* messages)
    {
        o.dataFolder = work.filePath("docs-" + tag);
        const QString config = QDir(o.dataFolder).filePath(dbfiles::Config);
        DbError e = PrepareDataFolder(o.dataFolder);
        if (!e)
            e = execOn(config, "UPDATE tDocTypes SET Include = TRUE, IncludeDraft = TRUE");
        if (!e && !recipeChange.isEmpty())
            e = execOn(config, recipeChange);
        if (e)
            return {e.message};
        const DocImportResult r = ImportDocuments(ErpReadContext{pgConn(dsn), nullptr, QString(), today}, o, nullptr);
        QStringList out{r.completed ? "completed" : "not completed"};
        for (const ReadError& error : r.errors) {
            out << error.title;
            *messages << error.message;
        }
        out << "== tTempDocHeaders" << rows(r.tempDocsPath, "SELECT * FROM tTempDocHeaders ORDER BY WizFileID, Number")
            << "== tTempDocLines" << rows(r.tempDocsPath, "SELECT * FROM tTempDocLines ORDER BY WizFileID, Number")
            << "== tWizFileRanges" << rows(config, "SELECT * FROM tWizFileRanges ORDER BY WizFileID");
        return out;
    }

private slots:
    void initTestCase()
    {
        DemoOptions o;
        o.connType = 2;
        o.today = today;
        o.labelLists = false;
        lite = odbc.addDemo("TagoraLite", o);
        const QString script = work.filePath("demo.sql");
        QFile f(script);
        QVERIFY(f.open(QIODevice::WriteOnly) && f.write(DemoErpScript(o).toUtf8()) > 0);
        f.close();
        QVERIFY2(!QStandardPaths::findExecutable("psql").isEmpty(), "psql is not installed");
        QString e;
        // Rows no reader may touch, and the same company where backslashes escape.
        const QString canary = "DROP TABLE IF EXISTS canary; CREATE TABLE canary (n int); INSERT INTO canary VALUES (1), (2), (3);";
        // The sequence gives a write that only the server's read-only session can refuse.
        QVERIFY2(psql({"-d", "postgres", "-f", script, "-c", canary, "-c", "CREATE SEQUENCE IF NOT EXISTS tagora_probe_seq"}, &e),
                 qPrintable(e));
        QVERIFY2(psql({"-d", "postgres", "-c", "DROP DATABASE IF EXISTS backslashes",
                       "-c", "CREATE DATABASE backslashes TEMPLATE postgres",
                       "-c", "ALTER DATABASE backslashes SET standard_conforming_strings = off"}, &e),
                 qPrintable(e));
        Database d;
        QVERIFY(!d.open(lite) && !d.exec(canary));
        for (const auto& [dsn, db] : {std::pair{"TagoraPg", "postgres"}, {"TagoraPgBackslash", "backslashes"}})
            odbc.addDsn(dsn, {{"Driver", "PostgreSQL Unicode"}, {"Servername", "127.0.0.1"}, {"Port", port},
                              {"Database", db}, {"Username", "postgres"}});
    }

    // A driver that reads braces keeps getting them: such a password connects.
    void serverNamesItself()
    {
        QString e;
        const auto c = openErp(BuildConnString("TagoraPg", "postgres", QVariant("x;y}{ "), "", 2), &e, 10);
        QVERIFY2(c, qPrintable(e));
        QCOMPARE(c->dbmsName(), QString("PostgreSQL"));
        QVERIFY(!c->isSqlite());
        // Literals pass unchanged to a server that knows them.
        QVERIFY2(firstValue(*c, "SELECT count(*) FROM PART WHERE PARTDES <> N'x'", &e).isValid(), qPrintable(e));
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
        QString e;
        const auto c = openErp(pgConn("TagoraPg"), &e, 10);
        QVERIFY2(c, qPrintable(e));
        const QString rows = "SELECT count(*) || '/' || count(DISTINCT PARTDES) FROM PART";
        const QVariant before = firstValue(*c, rows, &e);
        QVERIFY2(before.isValid(), qPrintable(e));
        QVERIFY(!c->query(sql, &e));
        QCOMPARE(firstValue(*c, rows, &e), before);
        QCOMPARE(firstValue(*c, "SELECT count(*) FROM information_schema.tables"
                                " WHERE table_name IN ('tagora_probe', 'tagora_copy')", &e).toLongLong(), 0LL);
    }

    // The session itself is read only: a write the guard cannot see (a
    // function that changes a sequence) is refused by the server.
    void sessionReadOnly()
    {
        QString e;
        const auto c = openErp(pgConn("TagoraPg"), &e, 10);
        QVERIFY2(c, qPrintable(e));
        QCOMPARE(firstValue(*c, "SELECT current_setting('transaction_read_only')", &e).toString(), QString("on"));
        auto rs = c->query("SELECT nextval('tagora_probe_seq')", &e);
        QVERIFY(!rs || !rs->next());
        QVERIFY2(e.contains("read-only") || (rs && rs->error().contains("read-only")), qPrintable(e));
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
        ErpReadContext ctx{pgConn("TagoraPg"), nullptr, QString(), today};
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

    // Values go to the server bound, as wide text: Hebrew, quotes and
    // backslashes arrive as written, whatever the server makes of a backslash.
    void boundValuesFindTheirRows_data()
    {
        QTest::addColumn<QString>("dsn");
        QTest::addColumn<QString>("column");
        QTest::addColumn<QString>("sample");
        for (const char* dsn : {"TagoraPg", "TagoraPgBackslash"}) {
            QTest::addRow("%s, Hebrew description", dsn)
                << dsn << "PARTDES" << QString::fromUtf8("SELECT min(PARTDES) FROM PART WHERE PARTDES LIKE 'בורג%'");
            QTest::addRow("%s, key with a quote", dsn)
                << dsn << "PARTNAME" << "SELECT min(PARTNAME) FROM PART WHERE PARTNAME LIKE '%''%'";
        }
    }
    void boundValuesFindTheirRows()
    {
        QFETCH(QString, dsn);
        QFETCH(QString, column);
        QFETCH(QString, sample);
        QString e;
        const auto c = openErp(pgConn(dsn), &e, 10);
        QVERIFY2(c, qPrintable(e));
        const QString value = firstValue(*c, sample, &e).toString();
        QVERIFY2(!value.isEmpty(), qPrintable(e));
        const QString find = QStringLiteral("SELECT %1 FROM PART WHERE %1 = ?").arg(column);
        auto rs = c->query(find, {value}, &e);
        QVERIFY2(rs, qPrintable(e));
        QVERIFY2(rs->next(), qPrintable(value));
        QCOMPARE(rs->value(0).toString(), value);
        // A backslash before the quote is part of the value, and nothing matches it.
        rs = c->query(find, {"\\'" + value}, &e);
        QVERIFY2(rs, qPrintable(e));
        QVERIFY(!rs->next());
        QVERIFY(!rs->failed());
    }

    // A family range whose bounds try to end their literal (a backslash
    // before the quote, for a server that reads it as an escape) is a range
    // like any other: the canary table keeps its rows, and the readers import
    // exactly the items within the bounds as the values read, or none.
    void hostileRangeIsAValue_data()
    {
        QTest::addColumn<QString>("dsn");
        QTest::addColumn<QString>("from");
        QTest::addColumn<QString>("to");
        const QString dropper = "\\'; DELETE FROM canary; --";
        for (const char* dsn : {"TagoraPgBackslash", "TagoraPg", "TagoraLite"}) {
            QTest::addRow("%s, lower bound deletes", dsn) << dsn << dropper << "";
            QTest::addRow("%s, upper bound deletes", dsn) << dsn << "" << "200" + dropper;
            QTest::addRow("%s, lower bound widens to every item", dsn) << dsn << "100\\' OR 1=1 --" << "200";
        }
    }
    void hostileRangeIsAValue()
    {
        QFETCH(QString, dsn);
        QFETCH(QString, from);
        QFETCH(QString, to);
        if (dsn == "TagoraPgBackslash") {
            // The premise: this server does read backslashes in literals.
            QString e;
            const auto c = openErp(pgConn(dsn), &e, 10);
            QVERIFY2(c, qPrintable(e));
            QCOMPARE(firstValue(*c, "SELECT current_setting('standard_conforming_strings')", &e).toString(), QString("off"));
        }
        const QString items = work.filePath(QString("range-%1.tdb").arg(QTest::currentDataTag()).replace(' ', '_'));
        const QString staging = items + ".tmp";
        DbError de;
        QVERIFY(!CreateItemsDB(items, &de).isEmpty() && !CreateTempItemsDB(staging, items, &de).isEmpty());
        const ErpReadContext ctx{pgConn(dsn), nullptr, QString(), today};
        ReadError e;
        QVERIFY2(ReadItemPriority(ctx, items, from, to, false, 1, 1, false, false, &e)
                     && ReadItemFName(ctx, items, from, to, false, &e)
                     && ReadPriceListPriority(ctx, staging, from, to, false, "tTempPriceList", &e),
                 qPrintable(e.title + e.message));
        QCOMPARE(canaryRows(dsn), 3);

        // The same bounds as values, straight from the company's file.
        const QString inRange = " AND trim(PARTNAME) <> '' AND TYPE IN ('R', 'P') AND FAMILY.FAMILY = PART.FAMILY"
                                " AND PARTPRICE.PART = PART.PART AND CURRENCIES.CURRENCY = PARTPRICE.CURRENCY"
                                " AND PART.FAMILYNAME >= coalesce(nullif(?1, ''), PART.FAMILYNAME)"
                                " AND PART.FAMILYNAME <= coalesce(nullif(?2, ''), PART.FAMILYNAME)"
                                " ORDER BY 1 COLLATE BINARY";
        const QString key = "SELECT DISTINCT replace(trim(PARTNAME), '\"', '''') FROM PART, FAMILY, PARTPRICE, CURRENCIES";
        const QStringList expectedItems = rows(
            lite, key + ", UNIT WHERE UNIT.UNIT = PART.UNIT AND PLIST = 1" + inRange, {from, to});
        QCOMPARE(rows(items, "SELECT ItemKey FROM tItems ORDER BY 1 COLLATE BINARY"), expectedItems);
        QCOMPARE(rows(staging, "SELECT DISTINCT ItemKey FROM tTempPriceList ORDER BY 1 COLLATE BINARY"),
                 rows(lite, key + " WHERE PLIST <> 0" + inRange, {from, to}));
        // The bounds that reach the server whole leave the families beyond them out.
        QCOMPARE(scalar(items, "SELECT count(*) FROM tItems WHERE ItemSort > '200'").toInt(), 0);
        QCOMPARE(expectedItems.isEmpty(), to.isEmpty());
    }

    // Every type read from the server as from the SQLite file: numbers and
    // dates bound as values, the LIKE of one number, each quantity rule's
    // extra query. A recipe naming a line column the ERP lacks is rejected by
    // the server after its type's headers were read: the run ends there,
    // nothing of that type kept and its range where it was.
    void documentsAsFromSqlite_data()
    {
        QTest::addColumn<int>("rule");
        QTest::addColumn<bool>("onlyLine0");
        QTest::addColumn<QString>("fromDate");
        QTest::addColumn<QString>("toDate");
        QTest::addColumn<QString>("number");
        QTest::addColumn<QString>("recipeChange");
        const QString day = "d/M/yyyy";
        QTest::newRow("line quantities, every date") << int(QtyLine) << false << "1/1/2000" << "31/12/2079" << "" << "";
        QTest::newRow("two months, header details")
            << int(QtyHeaderDetails) << false << today.addDays(-60).toString(day) << today.addDays(-1).toString(day)
            << "" << "";
        QTest::newRow("factory units, first line only") << int(QtyFactoryUnit) << true << "" << "" << "" << "";
        QTest::newRow("packages") << int(QtyPackages) << false << "" << "" << "" << "";
        QTest::newRow("one number, by its end") << int(QtyLine) << false << "" << "" << "000003" << "";
        QTest::newRow("a line column the ERP lacks")
            << int(QtyLine) << false << "" << "" << ""
            << "UPDATE tWizFiles SET fldLineID = 'NO_SUCH_LINE' WHERE WizFileID = 2";
    }
    void documentsAsFromSqlite()
    {
        QFETCH(int, rule);
        QFETCH(bool, onlyLine0);
        QFETCH(QString, fromDate);
        QFETCH(QString, toDate);
        QFETCH(QString, number);
        QFETCH(QString, recipeChange);
        DocImportOptions o;
        o.qtyFrom = rule;
        o.qtyFactor = "2";
        o.onlyLine0 = onlyLine0;
        o.fromDate = fromDate;
        o.toDate = toDate;
        o.fromDocNum = o.toDocNum = number;
        const QString tag = QString::number(++docRuns);
        QStringList pgErrors, liteErrors;
        const QStringList fromPg = importDocs("TagoraPg", "pg-" + tag, o, recipeChange, &pgErrors);
        const QStringList fromLite = importDocs("TagoraLite", "lite-" + tag, o, recipeChange, &liteErrors);
        QCOMPARE(fromPg, fromLite);
        const QString docs = QDir(work.filePath("docs-pg-" + tag)).filePath(dbfiles::TempDocs);
        const QString config = QDir(work.filePath("docs-pg-" + tag)).filePath(dbfiles::Config);
        if (recipeChange.isEmpty()) {
            // Lines of every recipe were read.
            QCOMPARE(rows(docs, "SELECT DISTINCT WizFileID FROM tTempDocLines ORDER BY 1"),
                     (QStringList{"1", "2", "3", "4", "5"}));
            QCOMPARE(fromPg.first(), QString("completed"));
            QVERIFY2(pgErrors.isEmpty(), qPrintable(pgErrors.join('\n')));
            return;
        }
        // The servers word their refusals each in its own way; both name the column.
        QCOMPARE(fromPg.mid(0, 2), (QStringList{"not completed", QString::fromUtf8("תקלה בקריאת מסמכים")}));
        QCOMPARE(pgErrors.size(), 1);
        QVERIFY2(pgErrors[0].contains("no_such_line", Qt::CaseInsensitive), qPrintable(pgErrors[0]));
        QVERIFY2(liteErrors.value(0).contains("no_such_line", Qt::CaseInsensitive), qPrintable(liteErrors.value(0)));
        QCOMPARE(scalar(docs, "SELECT count(*) FROM tTempDocHeaders WHERE WizFileID = 2").toInt(), 0);
        QCOMPARE(rows(config, "SELECT LastIndx, FromIndx FROM tWizFileRanges WHERE WizFileID = 1"), QStringList{"0|0"});
    }

    void priceFieldsFromServer()
    {
        QString e;
        const auto fields = ReadPriceFields(pgConn("TagoraPg"), &e);
        QVERIFY2(e.isEmpty(), qPrintable(e));
        QVERIFY(fields.size() >= 4);
        for (const PriceField& f : fields)
            QVERIFY(f.priceList != -50);
    }
};

QTEST_GUILESS_MAIN(TestPgImport)
#include "tst_pgimport.moc"
