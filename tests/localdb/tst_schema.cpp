#include "support/dbrows.h"
#include "support/oldlayout.h"

#include "localdb/database.h"
#include "localdb/schema.h"

#include <QDir>
#include <QFile>
#include <QProcess>
#include <QTemporaryDir>
#include <QtTest>

using namespace tagora;

namespace {
QStringList columnsOf(const Database& db, const QString& table, bool keyOnly = false)
{
    QStringList out;
    // table_info gives pk positions 1..n for key columns.
    Statement s = db.prepare(QStringLiteral("SELECT name, pk FROM pragma_table_info('%1') %2")
                                 .arg(table, keyOnly ? QStringLiteral("WHERE pk > 0 ORDER BY pk") : QString()));
    while (s.step() == Statement::Step::Row)
        out << s.value(0).toString();
    return out;
}

QStringList linkNames(const Database& db)
{
    QStringList out;
    for (const auto& [name, source] : db.links())
        out << name;
    return out;
}
} // namespace

class TestSchema : public QObject {
    Q_OBJECT
    QTemporaryDir dir;
    QString folder;

    QString path(const QString& name) const { return QDir(folder).filePath(name); }

    // A new file of the kind named: documents, staging, or else items.
    DbError create(const QString& kind, const QString& target) const
    {
        DbError e;
        if (kind == dbfiles::TempDocs)
            CreateTempDocsDB(path(dbfiles::Config), path(dbfiles::Items), target, &e);
        else if (kind == dbfiles::TempItems)
            CreateTempItemsDB(target, path(dbfiles::Items), &e);
        else
            CreateItemsDB(target, &e);
        return e;
    }

private slots:
    void initTestCase()
    {
        Database::setBusyTimeout(100);
        folder = dir.filePath("data");
        QVERIFY2(!PrepareDataFolder(folder), "data folder");
    }

    void preparingAgainTouchesNothing()
    {
        QVERIFY(!execOn(path(dbfiles::Items), "INSERT INTO tItems (ItemKey) VALUES ('KEEP')"));
        QVERIFY(!PrepareDataFolder(folder));
        QCOMPARE(rows(path(dbfiles::Items), "SELECT ItemKey FROM tItems"), QStringList{"KEEP"});
        QVERIFY(!execOn(path(dbfiles::Items), "DELETE FROM tItems"));
    }

    // Each creation starts from nothing: built twice, the file holds the same
    // tables, links and queries, no rows, and every stored select runs.
    void recreation_data()
    {
        QTest::addColumn<QString>("file");
        QTest::newRow("documents") << dbfiles::TempDocs;
        QTest::newRow("items") << "items-copy.tdb";
        QTest::newRow("staging") << dbfiles::TempItems;
    }
    void recreation()
    {
        QFETCH(QString, file);
        const QString target = path(file);
        QStringList made[2];
        for (int round = 0; round < 2; ++round) {
            const DbError e = create(file, target);
            QVERIFY2(!e, qPrintable(e.message));
            Database db;
            QVERIFY(!db.open(target));
            const QStringList tables = db.tableNames();
            QVERIFY(!tables.isEmpty());
            made[round] = tables + linkNames(db) + db.queryNames();
            for (const QString& t : tables) {
                if (round == 0) {
                    const QStringList key = columnsOf(db, t, true);
                    QVERIFY(!db.exec(QStringLiteral("INSERT INTO %1 (%2) VALUES (%3)")
                                         .arg(t, key.join(','), QStringList(key.size(), "1").join(','))));
                } else {
                    QCOMPARE(db.scalar(QStringLiteral("SELECT count(*) FROM %1").arg(t)).toInt(), 0);
                }
            }
            for (const QString& q : db.queryNames())
                if (db.querySql(q).startsWith("SELECT"))
                    QVERIFY2(db.prepare(QStringLiteral("SELECT * FROM %1").arg(q)).isValid(), qPrintable(q));
        }
        QCOMPARE(made[1], made[0]);
    }

    // Numbers given to account definitions since deleted are not given again,
    // in a new file or in one rebuilt from an earlier version.
    void definitionNumbersNotReused_data()
    {
        QTest::addColumn<bool>("older");
        QTest::newRow("new file") << false;
        QTest::newRow("upgraded file") << true;
    }
    void definitionNumbersNotReused()
    {
        QFETCH(bool, older);
        const QString items = path(older ? "older-defs.tdb" : "new-defs.tdb");
        const QString sql = "INSERT INTO tAccountDef (AccountKey) VALUES ('C1'), ('C2'), ('C3');"
                             "DELETE FROM tAccountDef WHERE AccountKey = 'C3'";
        DbError e;
        if (older) {
            QVERIFY(!makeOldItemsDb(items, sql));
            QVERIFY(!UpgradeCaselessKeys(items));
        } else {
            QVERIFY(!CreateItemsDB(items, &e).isEmpty());
        }
        Database db;
        QVERIFY(!db.open(items));
        if (!older)
            QVERIFY(!db.exec(sql));
        QVERIFY(!db.exec("INSERT INTO tAccountDef (AccountKey) VALUES ('C4')"));
        QCOMPARE(db.scalar("SELECT DefID FROM tAccountDef WHERE AccountKey = 'C4'").toInt(), 4);
    }

    // What the item import's merge does to the main tables.
    void merges_data()
    {
        QTest::addColumn<QString>("main");
        QTest::addColumn<QString>("staged");
        QTest::addColumn<QString>("query");
        QTest::addColumn<QString>("check");
        QTest::addColumn<QString>("expected");
        QTest::newRow("alternate barcode kept, number updated")
            << "INSERT INTO tAlterKeys VALUES ('C1', 'I1', 'old', 'BAR-7')"
            << "INSERT INTO tTempAlterKeys VALUES ('C1', 'I1', 'new', 'ignored')" << "qAddUpdateAlterKeys"
            << "SELECT AlterNum || '/' || AlterBar FROM tAlterKeys WHERE AccountKey='C1'" << "new/BAR-7";
        QTest::newRow("staged key in another case updates the stored row")
            << "INSERT INTO tAlterKeys VALUES ('AB''12', 'EL-1019', 'old', 'BAR-7')"
            << "INSERT INTO tTempAlterKeys VALUES ('ab''12', 'el-1019', 'new', NULL)" << "qAddUpdateAlterKeys"
            << "SELECT group_concat(AccountKey || '/' || ItemKey || '=' || AlterNum || '/' || AlterBar) FROM tAlterKeys"
            << "AB'12/EL-1019=new/BAR-7";
        QTest::newRow("new alternate has no barcode")
            << "" << "INSERT INTO tTempAlterKeys VALUES ('C''2', 'I1', 'n2', 'B2')" << "qAddUpdateAlterKeys"
            << "SELECT AlterNum || '/' || coalesce(AlterBar, 'none') FROM tAlterKeys WHERE AccountKey='C''2'" << "n2/none";
        QTest::newRow("absent main row stays")
            << "INSERT INTO tAlterPrices VALUES ('C9', 'I9', 5, 'EUR')"
            << "INSERT INTO tTempAlterPrices VALUES ('C1', 'I1', 7, '$')" << "qAddUpdateAlterPrices"
            << "SELECT group_concat(AccountKey || '=' || Price, ';') FROM (SELECT * FROM tAlterPrices ORDER BY AccountKey)"
            << "C1=7.0;C9=5.0";
        QTest::newRow("special price updated")
            << "INSERT INTO tAlterPrices VALUES ('C1', 'I1', 5, 'EUR')"
            << "INSERT INTO tTempAlterPrices VALUES ('C1', 'I1', 6.5, '$')" << "qAddUpdateAlterPrices"
            << "SELECT Price || Coin FROM tAlterPrices" << "6.5$";
        QTest::newRow("price list 0 is not merged")
            << "INSERT INTO tPriceList VALUES ('I1', 1, 10, 'ILS')"
            << "INSERT INTO tTempPriceList VALUES ('I1', 0, 99, 'ILS'); INSERT INTO tTempPriceList VALUES ('I1', 1, 11, 'ILS');"
               "INSERT INTO tTempPriceList VALUES ('I2', 3, 30, 'USD')"
            << "qAddUpdatePriceList"
            << "SELECT group_concat(ItemKey || ':' || PriceList || '=' || Price, ';') FROM (SELECT * FROM tPriceList ORDER BY 1, 2)"
            << "I1:1=11.0;I2:3=30.0";
    }
    void merges()
    {
        QFETCH(QString, main);
        QFETCH(QString, staged);
        QFETCH(QString, query);
        QFETCH(QString, check);
        QFETCH(QString, expected);
        const QString items = path("merge-items.tdb");
        const QString staging = path("merge-staging.tmp");
        DbError e;
        QVERIFY(!CreateItemsDB(items, &e).isEmpty());
        QVERIFY(!CreateTempItemsDB(staging, items, &e).isEmpty());
        Database db;
        QVERIFY(!db.open(staging));
        if (!main.isEmpty())
            QVERIFY(!db.exec(main));
        QVERIFY(!db.exec(staged));
        QVERIFY2(!(e = db.runQuery(query)), qPrintable(e.message));
        // Running it again changes nothing more.
        QVERIFY(!db.runQuery(query));
        QCOMPARE(db.scalar(check).toString(), expected);
    }

    // Keys that differ only in case are one key, in every file made now.
    void keysIgnoreCase_data()
    {
        QTest::addColumn<QString>("file");
        QTest::addColumn<QString>("first");
        QTest::addColumn<QString>("second");
        QTest::newRow("items") << dbfiles::Items << "INSERT INTO tItems (ItemKey) VALUES ('AB''12')"
                               << "INSERT INTO tItems (ItemKey) VALUES ('ab''12')";
        QTest::newRow("alternate keys") << dbfiles::Items << "INSERT INTO tAlterKeys (AccountKey, ItemKey) VALUES ('C1', 'EL-1')"
                                        << "INSERT INTO tAlterKeys (AccountKey, ItemKey) VALUES ('c1', 'el-1')";
        QTest::newRow("staged price lists") << dbfiles::TempItems
                                            << "INSERT INTO tTempPriceList (ItemKey, PriceList) VALUES ('EL-1', 2)"
                                            << "INSERT INTO tTempPriceList (ItemKey, PriceList) VALUES ('el-1', 2)";
    }
    void keysIgnoreCase()
    {
        QFETCH(QString, file);
        QFETCH(QString, first);
        QFETCH(QString, second);
        const QString target = path("case-" + file);
        const DbError e = create(file, target);
        QVERIFY2(!e, qPrintable(e.message));
        Database db;
        QVERIFY(!db.open(target));
        QVERIFY(!db.exec(first));
        QVERIFY(db.exec(second).isDuplicateKey());
    }

    // A file of an earlier version gets caseless keys without losing a row:
    // of keys that become one, the first stored stays and the others move
    // whole into the table's side table.
    void upgradeOlderFile_data()
    {
        QTest::addColumn<QString>("rows");
        QTest::addColumn<QString>("table");
        QTest::addColumn<QString>("columns");
        QTest::addColumn<QStringList>("kept");
        QTest::addColumn<QStringList>("setAside");
        QTest::newRow("items")
            << "INSERT INTO tItems (ItemKey, ItemName, PrintLabel) VALUES ('ab''12', 'first', 1), ('X1', 'other', 0),"
               " ('AB''12', 'second', 1)"
            << "tItems" << "ItemKey, ItemName, PrintLabel" << QStringList{"ab'12|first|1", "X1|other|0"}
            << QStringList{"AB'12|second|1"};
        QTest::newRow("alternate keys by account and item")
            << "INSERT INTO tAlterKeys VALUES ('C1', 'I1', 'n1', 'b1'), ('c1', 'i1', 'n2', 'b2'), ('c1', 'I2', 'n3', NULL)"
            << "tAlterKeys" << "AccountKey, ItemKey, AlterNum, AlterBar" << QStringList{"C1|I1|n1|b1", "c1|I2|n3|<null>"}
            << QStringList{"c1|i1|n2|b2"};
        QTest::newRow("price lists: another list is another key")
            << "INSERT INTO tPriceList VALUES ('i1', 1, 10, 'ILS'), ('I1', 2, 20, 'ILS'), ('I1', 1, 11, 'USD')"
            << "tPriceList" << "ItemKey, PriceList, Price" << QStringList{"i1|1|10", "I1|2|20"} << QStringList{"I1|1|11"};
        QTest::newRow("account definitions keep every row")
            << "INSERT INTO tAccountDef (AccountKey, LabelName) VALUES ('C1', 'a.lbl'), ('c1', 'b.lbl')" << "tAccountDef"
            << "DefID, AccountKey, LabelName" << QStringList{"1|C1|a.lbl", "2|c1|b.lbl"} << QStringList{};
    }
    void upgradeOlderFile()
    {
        QFETCH(QString, rows);
        QFETCH(QString, table);
        QFETCH(QString, columns);
        QFETCH(QStringList, kept);
        QFETCH(QStringList, setAside);
        const QString items = path("older.tdb");
        DbError e = makeOldItemsDb(items, rows);
        QVERIFY2(!e, qPrintable(e.message));
        auto read = [&](const QString& from) {
            return ::rows(items, QStringLiteral("SELECT %1 FROM %2 ORDER BY rowid").arg(columns, from));
        };
        CaselessKeysReport report;
        QVERIFY2(!(e = UpgradeCaselessKeys(items, &report)), qPrintable(e.message));
        QCOMPARE(report.rebuilt, QStringList({"tItems", "tAlterKeys", "tAlterPrices", "tAccountDef", "tPriceList"}));
        QCOMPARE(report.setAside, int(setAside.size()));
        QCOMPARE(report.sideTables, setAside.isEmpty() ? QStringList() : QStringList{table + "CaseDup"});
        QCOMPARE(read(table), kept);
        QCOMPARE(read(table + "CaseDup"), setAside);

        Database db;
        QVERIFY(!db.open(items));
        // The table now holds keys the way a new file does, and the stored query still reads it.
        QCOMPARE(db.scalar("SELECT count(*) FROM tItems WHERE ItemKey = 'x1'").toInt(), rows.contains("'X1'") ? 1 : 0);
        QVERIFY(db.exec("INSERT INTO tAlterKeys (AccountKey, ItemKey) VALUES ('K', 'I'), ('k', 'i')").isDuplicateKey());
        QVERIFY(db.prepare("SELECT * FROM qSelectItems").isValid());
        QCOMPARE(columnsOf(db, "tAccountDef").size(), 8);
        db.close();

        // Done once: a second run finds nothing to do and changes nothing.
        QVERIFY(!UpgradeCaselessKeys(items, &report));
        QCOMPARE(report.rebuilt, QStringList());
        QCOMPARE(read(table), kept);
    }

    // An older documents database, its links open, gets caseless keys too.
    void upgradeOlderDocumentsFile()
    {
        DbError e;
        const QString made = CreateTempDocsDB(path(dbfiles::Config), path(dbfiles::Items), path("made-docs.tmp"), &e);
        QVERIFY(!made.isEmpty());
        const QString docs = path("older-docs.tmp");
        QVERIFY(!oldLayoutOf(made, docs, "INSERT INTO tTempDocHeaders (WizFileID, Number, AccountKey) VALUES (2, 7, 'c1')"));
        CaselessKeysReport report;
        QVERIFY2(!(e = UpgradeCaselessKeys(docs, &report)), qPrintable(e.message));
        QCOMPARE(report.rebuilt, QStringList({"tTempDocHeaders", "tTempDocLines"}));
        Database db;
        QVERIFY(!db.open(docs));
        QCOMPARE(db.scalar("SELECT Number FROM tTempDocHeaders WHERE AccountKey = 'C1'").toInt(), 7);
        QVERIFY(db.prepare("SELECT * FROM qSelectDocLines").isValid());
    }

    // A creation that fails half way leaves nothing of itself: the file
    // already at the name stays as it was, and nothing is left aside.
    void missingLinkSourceStopsAtThatLink()
    {
        const QString config = path("partial-config.tdb");
        {
            Database c;
            QVERIFY(!c.open(config, Database::OpenMode::Create));
            // No tCurrencies: the third link fails.
            QVERIFY(!c.exec("CREATE TABLE tDocTypes (DocType); CREATE TABLE tCSTable (a); CREATE TABLE tWizFiles (a);"
                            "CREATE TABLE tWizFileRanges (a)"));
        }
        QTemporaryDir other;
        const QString target = other.filePath(dbfiles::TempDocs);
        DbError e;
        QVERIFY(!CreateTempDocsDB(path(dbfiles::Config), path(dbfiles::Items), target, &e).isEmpty());
        QVERIFY(!execOn(target, "INSERT INTO tAgents (AgentID, AgentName) VALUES (1, 'earlier')"));
        QVERIFY(CreateTempDocsDB(config, path(dbfiles::Items), target, &e).isEmpty());
        QCOMPARE(e.kind, DbError::Kind::NotFound);
        QVERIFY(e.message.contains("tCurrencies"));
        QCOMPARE(QDir(other.path()).entryList(QDir::Files | QDir::Hidden), QStringList{dbfiles::TempDocs});
        QCOMPARE(rows(target, "SELECT AgentName FROM tAgents"), QStringList{"earlier"});
        QVERIFY(MissingObjects(target).isEmpty());
    }

    // An items database an earlier version left half made (a run killed
    // while creating it) is completed where it lies, with its rows.
    void incompleteItemsDatabaseCompleted_data()
    {
        QTest::addColumn<QString>("made");
        QTest::newRow("items table only") << "CREATE TABLE tItems (ItemKey TEXT(25) COLLATE NOCASE NOT NULL, ItemName TEXT(100),"
                                             " Copies SMALLINT, PrintLabel BOOLEAN, CONSTRAINT PrimaryKey PRIMARY KEY (ItemKey))";
        QTest::newRow("empty file") << "";
    }
    void incompleteItemsDatabaseCompleted()
    {
        QFETCH(QString, made);
        QTemporaryDir data;
        const QString items = data.filePath(dbfiles::Items);
        {
            Database db;
            QVERIFY(!db.open(items, Database::OpenMode::Create));
            if (!made.isEmpty())
                QVERIFY(!db.exec(made + ";INSERT INTO tItems (ItemKey, ItemName, Copies, PrintLabel) VALUES ('K1', 'Kept', 2, TRUE)"));
        }
        QVERIFY(!MissingObjects(items).isEmpty());
        const DbError e = PrepareDataFolder(data.path());
        QVERIFY2(!e, qPrintable(e.message));
        QVERIFY(MissingObjects(items).isEmpty());
        QCOMPARE(rows(items, "SELECT ItemKey, Copies FROM qSelectMarkedItems"), made.isEmpty() ? QStringList() : QStringList{"K1|2"});
        QCOMPARE(rows(items, "SELECT count(FldID), count(FldMaxLen), count(Label2Name) FROM tAccountDef"), QStringList{"0|0|0"});
    }

    // A documents database whose creation stopped before its links is built
    // again, linked to the folder's files; one with its links keeps its rows.
    void incompleteDocumentsDatabaseCompleted_data()
    {
        QTest::addColumn<bool>("linked");
        QTest::newRow("no links") << false;
        QTest::newRow("queries missing") << true;
    }
    void incompleteDocumentsDatabaseCompleted()
    {
        QFETCH(bool, linked);
        const QString docs = path(dbfiles::TempDocs);
        DbError e;
        QVERIFY(!CreateTempDocsDB(path(dbfiles::Config), path(dbfiles::Items), docs, &e).isEmpty());
        QVERIFY(!execOn(docs, QStringLiteral("INSERT INTO tAgents (AgentID, AgentName) VALUES (1, 'A'); DELETE FROM tgrObjects%1")
                                  .arg(linked ? " WHERE Kind <> 'link'" : "")));
        QStringList repaired;
        QVERIFY(!(e = RepairDataFolder(folder, &repaired)));
        QCOMPARE(repaired, QStringList{dbfiles::TempDocs});
        QVERIFY(MissingObjects(docs).isEmpty());
        QCOMPARE(rows(docs, "SELECT AgentName FROM tAgents"), linked ? QStringList{"A"} : QStringList());
        QVERIFY(!rows(docs, "SELECT HeadTable FROM qDocTypes").isEmpty());
    }

    // Files a killed build left are removed on the next run; a build of a
    // running process, one of another machine and every other file stay.
    void leftoverBuildsRemoved()
    {
        QTemporaryDir data;
        QProcess gone;
        gone.start("true");
        QVERIFY(gone.waitForStarted());
        const qint64 deadPid = gone.processId();
        QVERIFY(gone.waitForFinished());
        const QString mine = BuildingPath(data.filePath(dbfiles::TempDocs));
        QString dead = BuildingPath(data.filePath(dbfiles::Items));
        dead.chop(QString::number(QCoreApplication::applicationPid()).size());
        dead += QString::number(deadPid);
        const QString deadName = QFileInfo(dead).fileName();
        const QString mineName = QFileInfo(mine).fileName();
        const QStringList planted{deadName, deadName + "-journal", mineName, "tgrmitm.tdb.building-elsewhere-1",
                                  "notes.building-x-1", "tagora.tdb.new", "tgrmitm.tdb.bak"};
        for (const QString& name : planted)
            QVERIFY(QFile(data.filePath(name)).open(QIODevice::WriteOnly));
        QVERIFY(!RepairDataFolder(data.path()));
        QCOMPARE(QDir(data.path()).entryList(QDir::Files | QDir::Hidden, QDir::Name),
                 QStringList({"notes.building-x-1", "tgrmitm.tdb.bak", "tgrmitm.tdb.building-elsewhere-1", mineName}));
    }

    void upgrade()
    {
        const QString items = path("upgrade.tdb");
        DbError e;
        QVERIFY(!CreateItemsDB(items, &e).isEmpty());
        QCOMPARE(UpgradeAccountDef(items, &e), items);
        QVERIFY(!e);
        // Done once, here or by preparing a folder, it is refused.
        for (const QString& done : {items, path(dbfiles::Items)}) {
            QVERIFY(UpgradeAccountDef(done, &e).isEmpty());
            QVERIFY2(e.message.contains("FldID"), qPrintable(e.message));
        }
        Database db;
        QVERIFY(!db.open(items));
        QCOMPARE(columnsOf(db, "tAccountDef").size(), 8);
        db.close();
        QVERIFY(UpgradeAccountDef(path("none.tdb"), &e).isEmpty());
        QCOMPARE(e.kind, DbError::Kind::NotFound);
    }

    // The documents database reaches the recipes and the items through one open file.
    void documentsDatabaseJoinsThroughLinks()
    {
        DbError e;
        const QString docs = CreateTempDocsDB(path(dbfiles::Config), path(dbfiles::Items), path(dbfiles::TempDocs), &e);
        QVERIFY(!docs.isEmpty());
        Database db;
        QVERIFY(!db.open(docs));
        QVERIFY(!db.scalar("SELECT HeadTable FROM qDocTypes WHERE DocType = 1").toString().isEmpty());
        QVERIFY(!db.exec("INSERT INTO tItems (ItemKey, ItemName) VALUES ('I1', 'Bolt');"
                         "INSERT INTO tTempDocHeaders (WizFileID, Number, DocType, DocDate, Include) VALUES (2, 7, 1, '2024-03-05', TRUE);"
                         "INSERT INTO tTempDocLines (WizFileID, HeadNumber, LineNum, ItemKey, Include) VALUES (2, 7, 1, 'I1', TRUE)"));
        Statement h = db.prepare("SELECT * FROM qSelectDocHeaders");
        QCOMPARE(h.step(), Statement::Step::Row);
        QVERIFY(!h.value("MyDocDesc").toString().isEmpty());
        QCOMPARE(h.value(2).toString(), QString("05/03/24"));
        QCOMPARE(db.scalar("SELECT ItemName FROM qSelectDocLines").toString(), QString("Bolt"));
        QVERIFY(!db.exec("DELETE FROM tItems"));
    }
};

QTEST_GUILESS_MAIN(TestSchema)
#include "tst_schema.moc"
