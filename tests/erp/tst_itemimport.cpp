// The item import against the demo company, read through the SQLite ODBC
// driver as the ERP would be read.
#include "support/cardfixture.h"
#include "support/dbrows.h"
#include "support/erpfixture.h"

#include "erp/connparams.h"
#include "erp/itemimport.h"
#include "erp/textconv.h"
#include "localdb/database.h"
#include "localdb/schema.h"

#include <QCheckBox>
#include <QComboBox>
#include <QKeyEvent>
#include <QLineEdit>
#include <QPushButton>
#include <QtTest>

using namespace tagora;

namespace {
const QString kDsn1 = QStringLiteral("TagoraDemo1");
const QString kDsn2 = QStringLiteral("TagoraDemo2");

QString conn(short type, const QString& dsn = QString())
{
    return BuildConnString(dsn.isEmpty() ? (type == 1 ? kDsn1 : kDsn2) : dsn, "sa", QVariant(), "demo", type);
}

} // namespace

class TestItemImport : public QObject {
    Q_OBJECT
    OdbcSandbox odbc;
    QTemporaryDir work;
    QString erp2;
    QString wideLists;
    QDate today = QDate::currentDate();
    int fresh = 0;

    QString newItemsDb()
    {
        const QString path = work.filePath(QStringLiteral("items%1.tdb").arg(++fresh));
        DbError e;
        if (CreateItemsDB(path, &e).isEmpty())
            qFatal("%s", qPrintable(e.message));
        return path;
    }

    QString newStaging(const QString& items)
    {
        const QString path = work.filePath(QStringLiteral("staging%1.tmp").arg(++fresh));
        DbError e;
        if (CreateTempItemsDB(path, items, &e).isEmpty())
            qFatal("%s", qPrintable(e.message));
        return path;
    }

    ErpReadContext ctx(short type, const QString& dsn = QString())
    {
        return ErpReadContext{conn(type, dsn), nullptr, QString(), today};
    }

    // A copy of a demo company, changed by sql, behind a data source of its own.
    QString addVariant(const QString& dsn, const QString& from, const QString& sql)
    {
        const QString path = odbc.dir.filePath(dsn + QStringLiteral(".sqlite"));
        QFile::remove(path);
        if (!QFile::copy(from, path))
            qFatal("cannot copy %s", qPrintable(from));
        {
            Database d;
            DbError e = d.open(path);
            if (!e)
                e = d.exec(sql);
            if (e)
                qFatal("%s", qPrintable(e.message));
        }
        odbc.addDsn(dsn, {{QStringLiteral("Driver"), QStringLiteral("SQLite3")}, {QStringLiteral("Database"), path}});
        return path;
    }

private slots:
    void initTestCase()
    {
        DemoOptions o;
        o.today = today;
        o.connType = 1;
        const QString erp1 = odbc.addDemo(kDsn1, o);
        o.connType = 2;
        erp2 = odbc.addDemo(kDsn2, o);
        // Dates stored with a time, as an ERP on a date-time column keeps them.
        addVariant("TagoraMorning", erp1, "UPDATE CUSTPARTPRICE SET FROMDATE = FROMDATE || ' 08:30:00',"
                                          " EXPIRYDATE = EXPIRYDATE || ' 08:30:00'");
        // Price lists numbered beyond 16 bits, one price per item; 65537 shares
        // its low 16 bits with list 1.
        wideLists = addVariant(
            "TagoraWideLists", erp2,
            "INSERT INTO PRICELIST (PLIST, PLNAME, PLDES) VALUES (40000, 'W40', 'Wide 40000'), (65537, 'W65', 'Wide 65537');"
            "INSERT INTO PARTPRICE (PART, PLIST, QUANT, PRICE, CURRENCY) SELECT PART, 40000, QUANT, max(PRICE) + 2000,"
            " CURRENCY FROM PARTPRICE WHERE PLIST = 1 AND PART % 2 = 0 GROUP BY PART;"
            "INSERT INTO PARTPRICE (PART, PLIST, QUANT, PRICE, CURRENCY) SELECT PART, 65537, QUANT, max(PRICE) + 1000,"
            " CURRENCY FROM PARTPRICE WHERE PLIST = 1 GROUP BY PART");
    }

    // Both connection types describe the same company: once converted, the
    // items must come out the same (the cell form alone keeps each type's order).
    void connectionTypesAgree_data()
    {
        QTest::addColumn<int>("priceList");
        QTest::addColumn<bool>("foreign");
        QTest::addColumn<bool>("warehouse");
        QTest::newRow("plain") << 0 << false << false;
        QTest::newRow("price list and warehouse") << 1 << false << true;
        QTest::newRow("foreign names in another list") << 2 << true << false;
    }
    void connectionTypesAgree()
    {
        QFETCH(int, priceList);
        QFETCH(bool, foreign);
        QFETCH(bool, warehouse);
        QStringList result[2];
        for (short type : {1, 2}) {
            const QString db = newItemsDb();
            ReadError e;
            QVERIFY2(ReadItemPriority(ctx(type), db, {}, {}, foreign, 3, priceList, false, warehouse, &e),
                     qPrintable(e.title + e.message));
            QVERIFY(ReadItemFName(ctx(type), db, {}, {}, false, &e));
            // Location names are stored as the ERP sends them, so they are left out here.
            result[type - 1] = rows(db, "SELECT ItemKey, ItemName, ItemSort, Unit, BarCode, Price, Coin, Copies, "
                                        "PurPackUN, Local IS NULL, Fname FROM tItems ORDER BY ItemKey");
        }
        QVERIFY(result[1].size() > 10);
        QCOMPARE(result[0], result[1]);
    }

    void itemRules()
    {
        const QString db = newItemsDb();
        ReadError e;
        QVERIFY(ReadItemPriority(ctx(2), db, {}, {}, false, 2, 0, false, false, &e));
        // Every R or P item with a key, and no other.
        const int erpItems = scalar(erp2, "SELECT count(*) FROM PART, FAMILY, UNIT WHERE TYPE IN ('R','P') "
                                          "AND FAMILY.FAMILY = PART.FAMILY AND UNIT.UNIT = PART.UNIT "
                                          "AND trim(PARTNAME) <> ''").toInt();
        QCOMPARE(scalar(db, "SELECT count(*) FROM tItems").toInt(), erpItems);
        QCOMPARE(rows(db, "SELECT DISTINCT Price || Coin FROM tItems"), QStringList{"0.0$"});
        QCOMPARE(rows(db, "SELECT DISTINCT Local FROM tItems"), QStringList{"0"});
        QCOMPARE(rows(db, "SELECT DISTINCT Copies || '/' || PurPackUN FROM tItems"), QStringList{"2/1.0"});
        QCOMPARE(scalar(db, "SELECT count(*) FROM tItems WHERE ItemKey LIKE '%\"%' OR ItemKey <> trim(ItemKey)").toInt(), 0);
        QCOMPARE(scalar(db, "SELECT count(*) FROM tItems WHERE ItemKey IN ('AB''12', 'LEAD-7', 'TRAIL-8', 'O''R-5')").toInt(), 4);
        // The cell form of the description.
        const QString cells = scalar(db, "SELECT VNItemName FROM tItems WHERE ItemKey = 'AB''12'").toString();
        QCOMPARE(cells, ReverseForCells(scalar(db, "SELECT ItemName FROM tItems WHERE ItemKey = 'AB''12'").toString(), 2));
    }

    // A second import finds the keys it wrote (quotes included) and keeps the marks.
    void secondImportUpdates()
    {
        const QString db = newItemsDb();
        ReadError e;
        QVERIFY(ReadItemPriority(ctx(2), db, {}, {}, false, 1, 1, false, false, &e));
        const int first = scalar(db, "SELECT count(*) FROM tItems").toInt();
        QVERIFY(!execOn(db, "UPDATE tItems SET PrintLabel = TRUE, Copies = 9, Price = -1 WHERE ItemKey = 'AB''12'"));
        QVERIFY(ReadItemPriority(ctx(2), db, {}, {}, false, 1, 1, false, false, &e));
        QCOMPARE(scalar(db, "SELECT count(*) FROM tItems").toInt(), first);
        QCOMPARE(rows(db, "SELECT PrintLabel, Copies, Price > 0 FROM tItems WHERE ItemKey = 'AB''12'"), QStringList{"1|1|1"});
    }

    // With foreign names, an item takes its foreign name; one without keeps
    // the name it had, and a new one gets none.
    void foreignNameMode()
    {
        const QString db = newItemsDb(), fresh = newItemsDb();
        ReadError e;
        QVERIFY(ReadItemPriority(ctx(2), db, {}, {}, false, 1, 0, false, false, &e));
        const QStringList before = rows(db, "SELECT ItemKey, ItemName FROM tItems ORDER BY 1");
        QVERIFY(ReadItemPriority(ctx(2), db, {}, {}, true, 1, 0, false, false, &e));
        QVERIFY(ReadItemPriority(ctx(2), fresh, {}, {}, true, 1, 0, false, false, &e));
        QMap<QString, QString> foreign;
        for (const QString& r : rows(erp2, "SELECT trim(replace(PARTNAME, '\"', '''')), coalesce(trim(EPARTDES), '') FROM PART"
                                           " JOIN PARTDES USING (PART) WHERE TYPE IN ('R','P') AND trim(PARTNAME) <> ''"))
            foreign[r.section('|', 0, 0)] = r.section('|', 1);
        const auto without = std::count(foreign.cbegin(), foreign.cend(), QString());
        QVERIFY(without > 0 && without < foreign.size());
        QStringList kept, made;
        for (const QString& r : before) {
            const QString key = r.section('|', 0, 0), name = foreign.value(key);
            kept << key + '|' + (name.isEmpty() ? r.section('|', 1) : name);
            made << key + '|' + (name.isEmpty() ? QString("<null>") : name);
        }
        QCOMPARE(rows(db, "SELECT ItemKey, ItemName FROM tItems ORDER BY 1"), kept);
        QCOMPARE(rows(fresh, "SELECT ItemKey, ItemName FROM tItems ORDER BY 1"), made);
    }

    void familyRange()
    {
        const QString db = newItemsDb();
        ReadError e;
        QVERIFY(ReadItemPriority(ctx(2), db, "200", "300", false, 1, 0, false, false, &e));
        QCOMPARE(rows(db, "SELECT DISTINCT ItemSort FROM tItems ORDER BY 1"), QStringList({"200", "300"}));
    }

    // Special prices valid today: the days a price starts and ends are in,
    // whether or not the ERP keeps a time with its dates; the day before a price starts is not.
    void specialPriceWindow_data()
    {
        QTest::addColumn<int>("type");
        QTest::addColumn<QString>("dsn");
        QTest::newRow("dates as dates") << 1 << QString();
        QTest::newRow("dates with a time of day") << 1 << "TagoraMorning";
        QTest::newRow("dates as minutes") << 2 << QString();
    }
    void specialPriceWindow()
    {
        QFETCH(int, type);
        QFETCH(QString, dsn);
        const QString staging = newStaging(newItemsDb());
        ReadError e;
        QVERIFY2(ReadAlterPricePRIORITY(ctx(short(type), dsn), staging, false, "tTempAlterPrices", &e),
                 qPrintable(e.message));
        const int todayMinutes = int(QDate(1988, 1, 1).daysTo(today)) * 1440;
        const QString window = QStringLiteral("FROMDATE <= %1 AND EXPIRYDATE >= %1").arg(todayMinutes);
        // A repeated account and item is staged once.
        const QStringList expected = rows(erp2, "SELECT DISTINCT trim(CUSTNAME) || '|' || replace(trim(PARTNAME), '\"', '''') FROM CUSTPARTPRICE "
                                                "JOIN CUSTOMERS USING (CUST) JOIN PART USING (PART) WHERE " + window +
                                                " ORDER BY 1");
        QCOMPARE(rows(staging, "SELECT AccountKey || '|' || ItemKey FROM tTempAlterPrices ORDER BY 1"), expected);
        // The item key takes an apostrophe for its double quote, as in tItems, so the price is found for it.
        QVERIFY(expected.contains("CH-100|AB'12"));
        QVERIFY(scalar(erp2, QStringLiteral("SELECT count(*) FROM CUSTPARTPRICE WHERE EXPIRYDATE = %1").arg(todayMinutes)).toInt() > 0);
        QVERIFY(scalar(erp2, QStringLiteral("SELECT count(*) FROM CUSTPARTPRICE WHERE FROMDATE = %1").arg(todayMinutes)).toInt() > 0);
        QVERIFY(scalar(erp2, QStringLiteral("SELECT count(*) FROM CUSTPARTPRICE WHERE FROMDATE = %1").arg(todayMinutes + 1440)).toInt() > 0);
    }

    void alternateKeysAndPriceLists()
    {
        const QString items = newItemsDb();
        const QString staging = newStaging(items);
        ReadError e;
        QVERIFY(ReadAlterKeyPRIORITY(ctx(2), staging, false, "tTempAlterKeys", &e));
        QVERIFY(ReadAlterKeySupPRIORITY(ctx(2), staging, false, "tTempAlterKeys", &e));
        QVERIFY(ReadPriceListPriority(ctx(2), staging, {}, {}, false, "tTempPriceList", &e));
        // A repeated account and item keeps its first row; an empty part number becomes "?".
        QVERIFY(scalar(staging, "SELECT count(*) FROM tTempAlterKeys WHERE AlterNum = '?'").toInt() > 0);
        // Account keys keep their double quotes; only item keys trade them for apostrophes.
        QVERIFY(scalar(staging, "SELECT count(*) FROM tTempAlterKeys WHERE AccountKey = 'A\"B-2'").toInt() > 0);
        QCOMPARE(scalar(staging, "SELECT count(*) FROM tTempAlterKeys WHERE ItemKey LIKE '%\"%'").toInt(), 0);
        QCOMPARE(scalar(staging, "SELECT count(*) FROM tTempPriceList WHERE PriceList = 0").toInt(), 0);
        QVERIFY(scalar(staging, "SELECT count(*) FROM tTempPriceList WHERE Currency = '?'").toInt() > 0);
        QVERIFY(scalar(staging, "SELECT count(*) FROM tTempPriceList WHERE PriceList = -50").toInt() > 0);
        QString mergeError;
        QVERIFY(UpdateMainItemTables(staging, &mergeError));
        QCOMPARE(rows(items, "SELECT * FROM tPriceList ORDER BY 1, 2"), rows(staging, "SELECT * FROM tTempPriceList ORDER BY 1, 2"));
        QCOMPARE(scalar(items, "SELECT count(*) FROM tAlterKeys").toInt(), scalar(staging, "SELECT count(*) FROM tTempAlterKeys").toInt());
    }

    // The list chosen on the tab is the list read, whatever its number.
    void wideListNumbers_data()
    {
        QTest::addColumn<int>("priceList");
        QTest::newRow("40000") << 40000;
        QTest::newRow("65537") << 65537;
    }
    void wideListNumbers()
    {
        QFETCH(int, priceList);
        const QString data = work.filePath(QStringLiteral("data%1").arg(++fresh));
        QVERIFY(!PrepareDataFolder(data));
        CardFixture f(QStringLiteral("[Params]\nConnServer=TagoraWideLists\nConnType=1\n[GeneralParams]\nDBPath=%1\n")
                          .arg(data)
                          .toUtf8());
        QVERIFY2(f.showMessages.isEmpty(), qPrintable(f.showMessages.join('\n')));
        auto* list = f.c<QComboBox>("cmbPriceField");
        QVERIFY(list->findData(priceList) >= 0);
        list->setCurrentIndex(list->findData(priceList));
        f.c<QPushButton>("CmdImportItems")->click();
        QVERIFY2(f.prompt->criticalCount() == 0, qPrintable(f.prompt->lines().join('\n')));
        const QStringList expected = rows(
            wideLists,
            QStringLiteral("SELECT replace(trim(PARTNAME), '\"', ''''), PRICE FROM PART, FAMILY, UNIT, PARTPRICE, CURRENCIES"
                           " WHERE TYPE IN ('R','P') AND FAMILY.FAMILY = PART.FAMILY AND UNIT.UNIT = PART.UNIT"
                           " AND PARTPRICE.PART = PART.PART AND PARTPRICE.PLIST = %1"
                           " AND CURRENCIES.CURRENCY = PARTPRICE.CURRENCY AND trim(PARTNAME) <> '' ORDER BY 1")
                .arg(priceList));
        QVERIFY(expected.size() > 5);
        QCOMPARE(rows(data + "/" + dbfiles::Items, "SELECT ItemKey, Price FROM tItems ORDER BY 1"), expected);
    }

    // A clean import that cannot read the ERP has emptied nothing: the
    // items and their marks are as they were.
    void failedCleanImportKeepsItems()
    {
        const QString data = work.filePath(QStringLiteral("data%1").arg(++fresh));
        QVERIFY(!PrepareDataFolder(data));
        const QString items = data + "/" + dbfiles::Items;
        QVERIFY(!execOn(items, "INSERT INTO tItems (ItemKey, PrintLabel, Copies) VALUES ('KEPT', TRUE, 4)"));
        CardFixture f(QStringLiteral("[Params]\nConnServer=NoSuchSource\nConnType=1\n[GeneralParams]\nDBPath=%1\n")
                          .arg(data)
                          .toUtf8());
        f.c<QCheckBox>("ChkClean")->setChecked(true);
        const int shown = f.prompt->criticalCount();
        f.c<QPushButton>("CmdImportItems")->click();
        QCOMPARE(f.prompt->criticalCount(), shown + 1);
        QCOMPARE(rows(items, "SELECT ItemKey, PrintLabel, Copies FROM tItems"), QStringList{"KEPT|1|4"});
    }

    // An import stopped half way, by the user or by a row the local table
    // refuses, keeps nothing of its rows: the table is as it was before.
    void interruptedImportKeepsTable_data()
    {
        QTest::addColumn<bool>("priceLists");
        QTest::addColumn<bool>("cancel");
        QTest::newRow("items, row refused") << false << false;
        QTest::newRow("items, cancelled") << false << true;
        QTest::newRow("price lists, row refused") << true << false;
        QTest::newRow("price lists, cancelled") << true << true;
    }
    void interruptedImportKeepsTable()
    {
        QFETCH(bool, priceLists);
        QFETCH(bool, cancel);
        const QString items = newItemsDb();
        const QString staging = newStaging(items);
        const QString db = priceLists ? staging : items;
        const QString table = priceLists ? QStringLiteral("tTempPriceList") : QStringLiteral("tItems");
        QVERIFY(!execOn(db, priceLists ? "INSERT INTO tTempPriceList (ItemKey, PriceList, Price) VALUES ('KEPT', 7, 1.5)"
                                       : "INSERT INTO tItems (ItemKey, PrintLabel, Copies) VALUES ('KEPT', TRUE, 4)"));
        if (!cancel)
            QVERIFY(!execOn(db, QStringLiteral("CREATE TRIGGER refuse BEFORE INSERT ON %1"
                                               " WHEN (SELECT count(*) FROM %1) >= 20 BEGIN SELECT RAISE(ABORT, 'refused'); END")
                                    .arg(table)));
        const QStringList before = rows(db, "SELECT * FROM " + table);

        struct Sink : ProgressSink {
            bool cancel = false;
            int asked = 0;
            double last = -1, most = 0;
            void setMessage(const QString&) override {}
            void setProgress(double f) override { last = f, most = std::max(most, f); }
            bool cancelRequested() override { return cancel && ++asked == 3; }
        } sink;
        sink.cancel = cancel;
        ErpReadContext c = ctx(2);
        c.progress = &sink;
        ReadError e;
        QVERIFY(!(priceLists ? ReadPriceListPriority(c, db, {}, {}, false, table, &e)
                             : ReadItemPriority(c, db, {}, {}, false, 1, 1, false, false, &e)));
        QCOMPARE(rows(db, "SELECT * FROM " + table), before);
        const QString prefix = priceLists ? "Error with price list: " : "Error reading item: ";
        if (cancel) {
            QCOMPARE(e.title, prefix);
        } else {
            QVERIFY2(e.title.size() > prefix.size() && e.title.startsWith(prefix), qPrintable(e.title));
            QVERIFY(e.message.contains("refused"));
        }
        QVERIFY(sink.most > 0);
        QCOMPARE(sink.last, 0.0);
    }

    // On the screen Esc cancels an import, and the items stay as they were.
    void escapeCancelsImportOnScreen()
    {
        const QString data = work.filePath(QStringLiteral("data%1").arg(++fresh));
        QVERIFY(!PrepareDataFolder(data));
        const QString items = data + "/" + dbfiles::Items;
        QVERIFY(!execOn(items, "INSERT INTO tItems (ItemKey, Copies) VALUES ('KEPT', 4)"));
        CardFixture f(QStringLiteral("[Params]\nConnServer=%1\nConnType=2\n[GeneralParams]\nDBPath=%2\n")
                          .arg(kDsn2, data)
                          .toUtf8());
        f.c<QCheckBox>("ChkClean")->setChecked(true);
        QCoreApplication::postEvent(f.card.get(), new QKeyEvent(QEvent::KeyPress, Qt::Key_Escape, Qt::NoModifier));
        const int shown = f.prompt->criticalCount();
        f.c<QPushButton>("CmdImportItems")->click();
        QCOMPARE(f.prompt->criticalCount(), shown + 1);
        QCOMPARE(rows(items, "SELECT ItemKey, Copies FROM tItems"), QStringList{"KEPT|4"});
    }

    void unreachableErp_data()
    {
        QTest::addColumn<QString>("connection");
        QTest::newRow("unknown data source") << "DSN=NoSuchSource;Uid=sa;pwd=";
        QTest::newRow("server refusing") << "Driver=PostgreSQL Unicode;Servername=127.0.0.1;Port=1;Database=x;Username=x";
    }
    void unreachableErp()
    {
        QFETCH(QString, connection);
        const QString db = newItemsDb();
        ReadError e;
        ErpReadContext c{connection, nullptr, QString(), today};
        QVERIFY(!ReadItemPriority(c, db, {}, {}, false, 1, 0, false, false, &e));
        QCOMPARE(e.title, QString("Error reading item: "));
        QVERIFY(!e.message.isEmpty());
        QVERIFY(ReadPriceFields(connection, &e.message).isEmpty());
    }

    // The first connection of a session fills the ERP's lists at once, with
    // their stored positions, so the save buttons work again; a cancelled
    // dialog leaves them empty and a save says it did nothing.
    void connectingFillsErpLists_data()
    {
        QTest::addColumn<QString>("button");
        QTest::newRow("OK") << "cmdOK";
        QTest::newRow("cancelled") << "cmdCancel";
    }
    void connectingFillsErpLists()
    {
        QFETCH(QString, button);
        const bool ok = button == "cmdOK";
        CardFixture f("[ImportItems]\nPriceField=2\n[GeneralParams]\nDefPrinter=Zebra\n", {"Office", "Zebra"});
        auto* prices = f.c<QComboBox>("cmbPriceField");
        QCOMPARE(prices->count(), 0);
        f.dialogs->drive = [&](QDialog& logon) {
            logon.findChild<QLineEdit*>("txtConnServer")->setText(kDsn2);
            logon.findChild<QComboBox*>("CmbConnType")->setCurrentIndex(1);
            logon.findChild<QPushButton*>(button)->click();
        };
        f.c<QPushButton>("CmdConnect")->click();
        QCOMPARE(prices->count() > 2, ok);
        QCOMPARE(prices->currentIndex(), ok ? 2 : -1);
        QCOMPARE(f.c<QComboBox>("cmbPrinter")->currentText(), QString("Zebra"));
        f.c<QLineEdit>("txtCopies")->setText("4");
        f.c<QPushButton>("cmdSaveDef2")->click();
        QCOMPARE(f.card->message(), ok ? QString::fromUtf8("ההגדרות נשמרו")
                                       : QString::fromUtf8("ההגדרות לא נשמרו: רשימת המחירונים ריקה (אין חיבור לפריוריטי)"));
        f.store->flush();
        QCOMPARE(f.store->value("Tagora", "ImportItems", "Copies").value_or("-"), QString(ok ? "4" : "-"));
        QCOMPARE(f.store->value("Tagora", "ImportItems", "PriceField").value_or("-"), QString("2"));
    }

    // The whole command, as a user runs it from the tab.
    void importCommand_data()
    {
        QTest::addColumn<bool>("cleanItems");
        QTest::addColumn<bool>("cleanAlter");
        QTest::addColumn<bool>("answer");
        QTest::addColumn<bool>("definitionsKept");
        QTest::newRow("plain") << false << false << true << true;
        QTest::newRow("clean items") << true << false << true << true;
        QTest::newRow("clean alternate keys") << false << true << true << true;
        QTest::newRow("both cleans rebuild") << true << true << true << false;
        QTest::newRow("declined") << true << true << false << true;
    }
    void importCommand()
    {
        QFETCH(bool, cleanItems);
        QFETCH(bool, cleanAlter);
        QFETCH(bool, answer);
        QFETCH(bool, definitionsKept);
        const QString data = work.filePath(QStringLiteral("data%1").arg(++fresh));
        QVERIFY(!PrepareDataFolder(data));
        const QString items = data + "/" + dbfiles::Items;
        QVERIFY(!execOn(items, "INSERT INTO tAccountDef (AccountKey, LabelName) VALUES ('C1', 'x.lbl');"
                        "INSERT INTO tItems (ItemKey) VALUES ('GONE-FROM-ERP');"
                        "INSERT INTO tAlterKeys (AccountKey, ItemKey, AlterNum) VALUES ('GONE', 'GONE-FROM-ERP', 'X')"));
        const QByteArray ini = QStringLiteral("[Params]\nConnServer=%1\nConnType=1\n[GeneralParams]\nDBPath=%2\n"
                                              "[ImportItems]\nPriceField=1\nImportAlterKeys=1\nReadPriceList=1\n")
                                   .arg(kDsn2, data).toUtf8();
        CardFixture f(ini);
        QVERIFY2(f.showMessages.isEmpty(), qPrintable(f.showMessages.join('\n')));
        QVERIFY(f.c<QComboBox>("cmbPriceField")->count() > 2);
        f.prompt->queueAnswer(answer);
        f.c<QCheckBox>("ChkClean")->setChecked(cleanItems);
        f.c<QCheckBox>("ChkCleanAlterKeys")->setChecked(cleanAlter);
        f.c<QPushButton>("CmdImportItems")->click();
        QVERIFY2(f.prompt->criticalCount() == 0, qPrintable(f.prompt->lines().join('\n')));
        QCOMPARE(scalar(items, "SELECT count(*) FROM tAccountDef").toInt(), definitionsKept ? 1 : 0);
        if (!answer) {
            QCOMPARE(scalar(items, "SELECT count(*) FROM tItems").toInt(), 1);
            return;
        }
        QCOMPARE(scalar(items, "SELECT count(*) FROM tAlterKeys WHERE AccountKey = 'GONE'").toInt(), cleanAlter ? 0 : 1);
        QCOMPARE(f.card->message(), QString::fromUtf8("הייבוא הסתיים בהצלחה"));
        QCOMPARE(f.card->progress(), 1.0);
        QCOMPARE(scalar(items, "SELECT count(*) FROM tItems WHERE ItemKey = 'GONE-FROM-ERP'").toInt(), cleanItems ? 0 : 1);
        QVERIFY(scalar(items, "SELECT count(*) FROM tAlterKeys").toInt() > 0);
        QVERIFY(scalar(items, "SELECT count(*) FROM tItems WHERE Price > 0 AND Coin <> '$'").toInt() > 0);
        QVERIFY(scalar(data + "/" + dbfiles::TempDocs, "SELECT count(*) FROM tPLName").toInt() > 0);
        QCOMPARE(scalar(items, "SELECT count(*) FROM tAccountDef WHERE Label2Name IS NULL").toInt(), definitionsKept ? 1 : 0);
    }
};

QTEST_MAIN(TestItemImport)
#include "tst_itemimport.moc"
