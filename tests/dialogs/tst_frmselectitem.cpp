#include "support/dbrows.h"

#include "dialogs/boundgrid.h"
#include "dialogs/frmselectitem.h"
#include "localdb/database.h"
#include "localdb/schema.h"
#include "platform/prompt.h"

#include <QLineEdit>
#include <QPushButton>
#include <QRadioButton>
#include <QComboBox>
#include <QTemporaryDir>
#include <QtTest>

using namespace tagora;

// Stands where the control would: notes what the dialog asks of it.
struct RecordingCommands : ControlCommands {
    QStringList asked;
    void showItemCard(const QString& itemKey, bool fromErp) override
    {
        asked << QStringLiteral("card %1 %2").arg(itemKey, fromErp ? "erp" : "local");
    }
    void printMarkedItems() override { asked << QStringLiteral("print"); }
};

class TestFrmSelectItem : public QObject {
    Q_OBJECT
    QTemporaryDir dir;
    QString folder;
    QString items;

    void fill(const QString& sql)
    {
        Database d;
        QVERIFY(!d.open(items));
        QVERIFY(!d.exec("DELETE FROM tItems"));
        QVERIFY(!d.exec(sql));
    }

    static QStringList keys(FrmSelectItem& f)
    {
        QStringList out;
        for (int r = 0; r < f.model()->rowCount(); ++r)
            out << f.model()->value(r, "ItemKey").toString();
        return out;
    }

    template <class T> static T* c(FrmSelectItem& f, const QString& name) { return f.findChild<T*>(name); }
    static BoundGrid* grid(FrmSelectItem& f) { return c<BoundGrid>(f, "VSSelectItems"); }

private slots:
    void initTestCase()
    {
        folder = dir.filePath("data");
        QVERIFY(!PrepareDataFolder(folder));
        items = folder + "/" + dbfiles::Items;
    }

    void firstPageInOrder()
    {
        fill("INSERT INTO tItems (ItemKey, ItemName, Copies, PrintLabel) VALUES ('C', 'c', 1, 0), ('A', 'a', 1, 0), ('B', 'b', 1, 0), ('D', 'd', 1, 0)");
        FrmSelectItem f(folder, QString(), nullptr);
        QCOMPARE(keys(f), QStringList({"A", "B", "C", "D"}));
        c<QLineEdit>(f, "txtItemsNum")->setText("2");
        c<QPushButton>(f, "cmdShowAll")->click();
        QCOMPARE(keys(f), QStringList({"A", "B"}));
    }

    void findByKey_data()
    {
        QTest::addColumn<QString>("typed");
        QTest::addColumn<QString>("current");
        QTest::addColumn<QString>("ticked");
        QTest::newRow("exact key ticks it") << "A1" << "A1" << "A1";
        QTest::newRow("key typed in another case ticks it") << "a1" << "A1" << "A1";
        QTest::newRow("start of a key ticks nothing") << "A" << "A0" << "";
        QTest::newRow("apostrophe in the key") << "O'R" << "O'R" << "O'R";
        QTest::newRow("no such key lists from there") << "Z" << "" << "";
    }
    void findByKey()
    {
        QFETCH(QString, typed);
        QFETCH(QString, current);
        QFETCH(QString, ticked);
        fill("INSERT INTO tItems (ItemKey, ItemName, Copies, PrintLabel) VALUES ('A0', 'x', 1, 0), ('A1', 'x', 1, 0), ('A10', 'x', 1, 0),"
             " ('O''R', 'x', 1, 0)");
        FrmSelectItem f(folder, QString(), nullptr);
        c<QLineEdit>(f, "txtToItemkey")->setText(typed);
        c<QPushButton>(f, "cmdFindKey")->click();
        const int row = grid(f)->currentRowIndex();
        QCOMPARE(row >= 0 && !current.isEmpty() ? f.model()->value(row, "ItemKey").toString() : QString(), current);
        QCOMPARE(rows(items, "SELECT ItemKey FROM tItems WHERE PrintLabel = 1").join(','), ticked);
    }

    // Marked items stay in the list whatever the search, and come first either way.
    void markedStayListedAndFirst()
    {
        fill("INSERT INTO tItems (ItemKey, ItemName, Copies, PrintLabel) VALUES ('A1', 'x', 1, 0), ('B1', 'x', 1, 0), ('K9', 'x', 1, 1)");
        FrmSelectItem f(folder, " And ItemKey <= 'B9'", nullptr);
        QCOMPARE(keys(f), QStringList({"K9", "A1", "B1"}));
        c<QComboBox>(f, "cmbItmSortOrder")->setCurrentIndex(1);
        c<QPushButton>(f, "cmdShowAll")->click();
        QCOMPARE(keys(f), QStringList({"K9", "B1", "A1"}));
        c<QPushButton>(f, "cmdShowMarked")->click();
        QCOMPARE(keys(f), QStringList({"K9"}));
    }

    void markAllTouchesOnlyTheList()
    {
        fill("WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < 2000)"
             " INSERT INTO tItems (ItemKey, ItemName, Copies, PrintLabel) SELECT printf('I%04d', i), 'x', 1, 0 FROM n");
        FrmSelectItem f(folder, QString(), nullptr);
        // A page size that is not a number gives the usual page.
        c<QLineEdit>(f, "txtItemsNum")->setText("abc");
        c<QPushButton>(f, "cmdShowAll")->click();
        QCOMPARE(f.model()->rowCount(), 500);
        c<QPushButton>(f, "CmdAllItems")->click();
        QCOMPARE(rows(items, "SELECT count(*), min(ItemKey), max(ItemKey) FROM tItems WHERE PrintLabel = 1"),
                 QStringList{"500|I0001|I0500"});
        c<QLineEdit>(f, "txtAllCopis")->setText("4");
        c<QPushButton>(f, "CmdAllCopies")->click();
        QCOMPARE(rows(items, "SELECT Copies, count(*) FROM tItems GROUP BY Copies ORDER BY 1"), QStringList({"1|1500", "4|500"}));
        c<QLineEdit>(f, "txtAllCopis")->setText("many");
        c<QPushButton>(f, "CmdAllCopies")->click();
        QCOMPARE(rows(items, "SELECT count(*) FROM tItems WHERE Copies = 0"), QStringList{"500"});
        c<QPushButton>(f, "cmdNoneItems")->click();
        QCOMPARE(rows(items, "SELECT count(*) FROM tItems WHERE PrintLabel = 1"), QStringList{"0"});
    }

    void findByDescription_data()
    {
        QTest::addColumn<int>("button");
        QTest::addColumn<QString>("text");
        QTest::addColumn<QString>("found");
        QTest::newRow("start of the name") << 0 << "bolt" << "B1";
        QTest::newRow("any part, case counts") << 1 << "Nut" << "N2";
        QTest::newRow("wildcards are plain text") << 1 << "50%" << "P5";
        QTest::newRow("apostrophe") << 0 << "it's" << "Q1";
    }
    void findByDescription()
    {
        QFETCH(int, button);
        QFETCH(QString, text);
        QFETCH(QString, found);
        fill("INSERT INTO tItems (ItemKey, ItemName, Copies, PrintLabel) VALUES ('B1', 'Bolt M6', 1, 0), ('N1', 'lock nut', 1, 0),"
             " ('N2', 'Lock Nut', 1, 0), ('P5', 'Paint 50% off', 1, 0), ('P6', 'Paint 500', 1, 0), ('Q1', 'it''s here', 1, 0)");
        FrmSelectItem f(folder, QString(), nullptr);
        c<QLineEdit>(f, "txtToItemName")->setText(text);
        c<QPushButton>(f, QStringLiteral("cmdFindByDesc(%1)").arg(button))->click();
        QCOMPARE(f.model()->value(grid(f)->currentRowIndex(), "ItemKey").toString(), found);
    }

    // Copies typed into the grid: whole numbers 0 to 32767, or the reason
    // why not, and the item keeps its copies.
    void typedCopies_data()
    {
        QTest::addColumn<QString>("typed");
        QTest::addColumn<QString>("stored");
        QTest::newRow("a count") << "12" << "12";
        QTest::newRow("letters") << "abc" << "1";
        QTest::newRow("beyond 32767") << "70000" << "1";
        QTest::newRow("negative") << "-3" << "1";
    }
    void typedCopies()
    {
        QFETCH(QString, typed);
        QFETCH(QString, stored);
        fill("INSERT INTO tItems (ItemKey, ItemName, Copies, PrintLabel) VALUES ('A1', 'x', 1, 1)");
        auto prompt = std::make_shared<ScriptedPrompt>(nullptr);
        FrmSelectItem f(folder, QString(), nullptr, prompt);
        f.model()->setData(f.model()->index(0, 3), typed, Qt::EditRole);
        QCOMPARE(rows(items, "SELECT Copies FROM tItems"), QStringList{stored});
        QCOMPARE(grid(f)->text(0, 3), stored);
        const bool refused = stored != typed;
        QCOMPARE(prompt->lines().size(), refused ? 1 : 0);
        if (refused)
            QVERIFY2(prompt->lines().first().contains(QString::fromUtf8("עותקים")), qPrintable(prompt->lines().first()));
    }

    // Another program holds the items file in a transaction: the change is
    // refused after a short wait, the user reads that the file is busy, and
    // the grid shows what the file holds, not the marks that were not saved.
    void lockedItemsFile_data()
    {
        QTest::addColumn<QString>("action");
        QTest::newRow("mark all") << "CmdAllItems";
        QTest::newRow("copies for the marked") << "CmdAllCopies";
        QTest::newRow("a tick in the grid") << "tick";
    }
    void lockedItemsFile()
    {
        QFETCH(QString, action);
        fill("INSERT INTO tItems (ItemKey, ItemName, Copies, PrintLabel) VALUES ('A1', 'x', 1, 1), ('B2', 'y', 1, 0)");
        auto prompt = std::make_shared<ScriptedPrompt>(nullptr);
        FrmSelectItem f(folder, QString(), nullptr, prompt);
        c<QLineEdit>(f, "txtAllCopis")->setText("7");
        Database holder;
        QVERIFY(!holder.open(items));
        QVERIFY(!holder.exec("BEGIN EXCLUSIVE"));
        if (action == "tick")
            f.model()->setData(f.model()->index(1, 2), Qt::Checked, Qt::CheckStateRole);
        else
            c<QPushButton>(f, action)->click();
        QVERIFY(!holder.exec("ROLLBACK"));

        QCOMPARE(prompt->lines().size(), 1);
        QVERIFY2(prompt->lines().first().contains(QString::fromUtf8("תפוס")), qPrintable(prompt->lines().first()));
        QCOMPARE(QStringList({grid(f)->text(0, 1), grid(f)->text(0, 2), grid(f)->text(0, 3), grid(f)->text(1, 1),
                              grid(f)->text(1, 2), grid(f)->text(1, 3)}),
                 QStringList({"A1", "1", "1", "B2", "0", "1"}));
        QCOMPARE(rows(items, "SELECT ItemKey, PrintLabel, Copies FROM tItems ORDER BY ItemKey"),
                 QStringList({"A1|1|1", "B2|0|1"}));
    }

    // The card column opens the row's item from the source chosen, and the
    // print button runs the control's print, through what the dialog was given.
    void cardColumnAndPrintReachTheControl()
    {
        fill("INSERT INTO tItems (ItemKey, ItemName, Copies, PrintLabel) VALUES ('A''1', 'x', 1, 0), ('B2', 'y', 1, 0)");
        RecordingCommands commands;
        FrmSelectItem f(folder, QString(), &commands);
        emit grid(f)->cellActivated(1, 0);
        c<QRadioButton>(f, "OptItmCard(1)")->setChecked(true);
        emit grid(f)->cellActivated(0, 0);
        emit grid(f)->cellActivated(0, 2); // not the card column
        c<QPushButton>(f, "cmdPrint")->click();
        QCOMPARE(commands.asked, QStringList({"card B2 erp", "card A'1 local", "print"}));
    }
};

QTEST_MAIN(TestFrmSelectItem)
#include "tst_frmselectitem.moc"
