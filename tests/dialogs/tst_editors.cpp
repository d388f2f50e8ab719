#include "support/dbrows.h"

#include "dialogs/boundgrid.h"
#include "dialogs/frmaccdef.h"
#include "dialogs/frmalteritems.h"
#include "dialogs/frmedititems.h"
#include "localdb/schema.h"
#include "platform/filedialog.h"
#include "platform/platformdefaults.h"
#include "platform/printdialog.h"
#include "platform/prompt.h"

#include <QComboBox>
#include <QItemSelectionModel>
#include <QLineEdit>
#include <QPushButton>
#include <QTemporaryDir>
#include <QtTest>

using namespace tagora;

namespace {
template <class T> T* c(QWidget& w, const QString& name) { return w.findChild<T*>(name); }
void click(QWidget& w, const QString& button) { c<QPushButton>(w, button)->click(); }

QString column(BoundTableModel* m, const char* field)
{
    QStringList out;
    for (int r = 0; r < m->rowCount(); ++r)
        out << m->value(r, field).toString();
    return out.join(',');
}
} // namespace

class TestEditors : public QObject {
    Q_OBJECT
    QTemporaryDir dir;
    QString folder;
    QString items;
    std::shared_ptr<ScriptedPrompt> prompt;

private slots:
    void initTestCase()
    {
        folder = dir.filePath("data");
        QVERIFY(!PrepareDataFolder(folder));
        items = folder + "/" + dbfiles::Items;
    }

    void init()
    {
        prompt = std::make_shared<ScriptedPrompt>(nullptr);
        const DbError e = execOn(items,
            "DELETE FROM tAlterKeys; DELETE FROM tItems; DELETE FROM tAccountDef;"
            "INSERT INTO tAlterKeys (AccountKey, ItemKey, AlterNum, AlterBar) VALUES"
            " ('C5', 'B2', 'N2', '200'), ('C5', 'A1', 'N1', '300'), ('C6', 'A1', 'N3', '100'),"
            " ('O''B', 'A1', 'N4', '400'), ('C5', 'X''1', 'N5', NULL);"
            "INSERT INTO tItems (ItemKey, ItemName, BarCode, Coin) VALUES"
            " ('K3', 'Big box', '3', '$'), ('K1', 'Box 10%', '1', '$'), ('K2', 'Nut', '2', '$'),"
            " ('K4', 'shoe''s box', '4', '$'), ('K5', 'a_b', '5', '$'), ('K6', 'axb', '6', '$')");
        QVERIFY2(!e, qPrintable(e.message));
    }

    void alterKeysFilters_data()
    {
        QTest::addColumn<int>("by0");
        QTest::addColumn<QString>("value0");
        QTest::addColumn<int>("by1");
        QTest::addColumn<QString>("value1");
        QTest::addColumn<int>("sortBy");
        QTest::addColumn<int>("order");
        QTest::addColumn<QString>("rows"); // AccountKey/ItemKey in the order shown
        QTest::newRow("no filter, no sort") << 0 << "" << 0 << "" << -1 << 0 << "C5/A1,C5/B2,C5/X'1,C6/A1,O'B/A1";
        QTest::newRow("item A1 and card C5") << 1 << "A1" << 0 << "C5" << -1 << 0 << "C5/A1";
        QTest::newRow("second filter alone") << 0 << "" << 2 << "N3" << -1 << 0 << "C6/A1";
        QTest::newRow("exact, not contains") << 0 << "C" << 0 << "" << -1 << 0 << "";
        QTest::newRow("apostrophe in card") << 0 << "O'B" << 0 << "" << -1 << 0 << "O'B/A1";
        QTest::newRow("apostrophe in item") << 1 << "X'1" << 0 << "" << -1 << 0 << "C5/X'1";
        QTest::newRow("typed SQL is a value") << 0 << "x' OR '1'='1" << 0 << "" << -1 << 0 << "";
        QTest::newRow("sort by barcode descending") << 0 << "" << 0 << "" << 3 << 1 << "O'B/A1,C5/A1,C5/B2,C6/A1,C5/X'1";
        QTest::newRow("sort by card descending, then item") << 0 << "" << 0 << "" << 0 << 1 << "O'B/A1,C6/A1,C5/A1,C5/B2,C5/X'1";
    }
    void alterKeysFilters()
    {
        QFETCH(int, by0);
        QFETCH(QString, value0);
        QFETCH(int, by1);
        QFETCH(QString, value1);
        QFETCH(int, sortBy);
        QFETCH(int, order);
        QFETCH(QString, rows);
        FrmAlterItems f(folder, prompt, nullptr);
        QCOMPARE(f.model()->rowCount(), 0); // empty until the first show
        c<QComboBox>(f, "cmbAltSearchBy(0)")->setCurrentIndex(by0);
        c<QLineEdit>(f, "txtAltSearchValue(0)")->setText(value0);
        c<QComboBox>(f, "cmbAltSearchBy(1)")->setCurrentIndex(by1);
        c<QLineEdit>(f, "txtAltSearchValue(1)")->setText(value1);
        c<QComboBox>(f, "cmbAltSortBy")->setCurrentIndex(sortBy);
        c<QComboBox>(f, "cmbAltSortOrder")->setCurrentIndex(order);
        click(f, "CmdShowAlterKeys");
        QStringList shown;
        for (int r = 0; r < f.model()->rowCount(); ++r)
            shown << f.model()->value(r, "AccountKey").toString() + "/" + f.model()->value(r, "ItemKey").toString();
        QCOMPARE(shown.join(','), rows);
        QVERIFY(prompt->shown().empty());
    }

    void setBarcodeOnSelectedRows()
    {
        FrmAlterItems f(folder, prompt, nullptr);
        click(f, "CmdShowAlterKeys"); // C5/A1, C5/B2, C5/X'1, C6/A1, O'B/A1
        auto* grid = c<BoundGrid>(f, "VSAlterKeys");
        auto* sel = grid->selectionModel();
        sel->clearSelection();
        for (int r : {0, 2, 4})
            sel->select(f.model()->index(r, 1), QItemSelectionModel::Select | QItemSelectionModel::Rows);
        c<QLineEdit>(f, "txtAltBarCode")->setText("7'77");
        click(f, "cmdSetAltBar");
        QCOMPARE(rows(items, "SELECT AccountKey || '/' || ItemKey || '=' || ifnull(AlterBar, '-') FROM tAlterKeys"
                             " ORDER BY AccountKey, ItemKey").join(','),
                 QString("C5/A1=7'77,C5/B2=200,C5/X'1=7'77,C6/A1=100,O'B/A1=7'77"));
        QCOMPARE(column(f.model(), "AlterBar"), QString("7'77,200,7'77,100,7'77"));
    }

    void printAsShown_data()
    {
        QTest::addColumn<bool>("answered");
        QTest::newRow("printed into the file") << true;
        QTest::newRow("cancelled") << false;
    }
    void printAsShown()
    {
        QFETCH(bool, answered);
        auto files = std::make_shared<ScriptedFileDialog>();
        const QString pdf = dir.filePath(QString("alter-%1.pdf").arg(answered));
        if (answered)
            files->queue(pdf);
        FrmAlterItems f(folder, prompt, std::make_shared<ScriptedPrintDialog>(files.get()));
        click(f, "CmdShowAlterKeys");
        click(f, "cmdPrintAltKeys");
        QCOMPARE(QFileInfo(pdf).size() > 1000, answered);
        QCOMPARE(files->asked().size(), size_t(1));
    }

    void itemSearch_data()
    {
        QTest::addColumn<int>("searchBy");
        QTest::addColumn<QString>("value");
        QTest::addColumn<int>("sortBy");
        QTest::addColumn<int>("order");
        QTest::addColumn<QString>("keys");
        QTest::newRow("box in names, key order") << 1 << "box" << 0 << 0 << "K1,K3,K4";
        QTest::newRow("box in names, name descending") << 1 << "box" << 1 << 1 << "K4,K1,K3";
        QTest::newRow("apostrophe") << 1 << "e's" << 0 << 0 << "K4";
        QTest::newRow("percent is a character") << 1 << "%" << 0 << 0 << "K1";
        QTest::newRow("underscore is a character") << 1 << "a_b" << 0 << 0 << "K5";
        QTest::newRow("typed SQL is a value") << 1 << "' OR 1=1 --" << 0 << 0 << "";
        QTest::newRow("empty is all, barcode descending") << 1 << "" << 2 << 1 << "K6,K5,K4,K3,K2,K1";
    }
    void itemSearch()
    {
        QFETCH(int, searchBy);
        QFETCH(QString, value);
        QFETCH(int, sortBy);
        QFETCH(int, order);
        QFETCH(QString, keys);
        FrmEditItems f(folder, true, prompt);
        QCOMPARE(f.model()->rowCount(), 0);
        c<QComboBox>(f, "cmbItmSearchBy")->setCurrentIndex(searchBy);
        c<QLineEdit>(f, "txtItmSearchValue")->setText(value);
        c<QComboBox>(f, "cmbItmSortBy")->setCurrentIndex(sortBy);
        c<QComboBox>(f, "cmbItmSortOrder")->setCurrentIndex(order);
        click(f, "cmdShowItems");
        QCOMPARE(column(f.model(), "ItemKey"), keys);
        QCOMPARE(scalar(items, "SELECT count(*) FROM tItems").toInt(), 6);
    }

    void itemTextDirection()
    {
        FrmEditItems rtl(folder, true, prompt), ltr(folder, false, prompt);
        QCOMPARE(c<BoundGrid>(rtl, "VSEditItems")->layoutDirection(), Qt::RightToLeft);
        QCOMPARE(c<BoundGrid>(ltr, "VSEditItems")->layoutDirection(), Qt::LeftToRight);
    }

    void secondNewItem()
    {
        FrmEditItems f(folder, true, prompt);
        click(f, "cmdAddAccount");
        QVERIFY(prompt->shown().empty());
        QCOMPARE(rows(items, "SELECT ItemName || '|' || Coin FROM tItems WHERE ItemKey = '00000000'"), QStringList{"פריט חדש|21"});
        // The first new item is being typed in when another is asked for.
        QVERIFY(execOn(items, "UPDATE tItems SET ItemName = 'typed' WHERE ItemKey = '00000000'").kind == DbError::Kind::None);
        click(f, "cmdAddAccount");
        QCOMPARE(prompt->shown().size(), size_t(1));
        QVERIFY(prompt->shown().front().text.contains("00000000"));
        QVERIFY(prompt->shown().front().text.isRightToLeft());
        QCOMPARE(rows(items, "SELECT ItemName FROM tItems WHERE ItemKey = '00000000'"), QStringList{"typed"});
        QCOMPARE(scalar(items, "SELECT count(*) FROM tItems").toInt(), 7);
    }

    // Each editor's delete: asked first, done on Yes, and a record already
    // gone is reported rather than shown as deleted.
    void deleteAsks_data()
    {
        QTest::addColumn<QString>("editor");
        QTest::addColumn<bool>("yes");
        QTest::addColumn<bool>("goneBefore");
        QTest::addColumn<int>("left");   // rows of the table after
        QTest::addColumn<int>("errors"); // critical messages
        for (const char* e : {"items", "alter", "accounts"}) {
            QTest::addRow("%s, no", e) << QString(e) << false << false << -1 << 0;
            QTest::addRow("%s, yes", e) << QString(e) << true << false << -2 << 0;
            QTest::addRow("%s, already gone", e) << QString(e) << true << true << -2 << 1;
        }
    }
    void deleteAsks()
    {
        QFETCH(QString, editor);
        QFETCH(bool, yes);
        QFETCH(bool, goneBefore);
        QFETCH(int, left);
        QFETCH(int, errors);
        QVERIFY(!execOn(items, "INSERT INTO tAccountDef (AccountKey, LabelName) VALUES ('A''1', 'a.lbl'), ('B2', 'b.lbl')"));
        std::unique_ptr<QDialog> f;
        QString table, button, question;
        if (editor == "items") {
            auto* d = new FrmEditItems(folder, true, prompt);
            f.reset(d);
            click(*d, "cmdShowItems");
            table = "tItems", button = "DelAccountDef", question = "למחוק את הפריט?";
        } else if (editor == "alter") {
            auto* d = new FrmAlterItems(folder, prompt, nullptr);
            f.reset(d);
            click(*d, "CmdShowAlterKeys");
            table = "tAlterKeys", button = "cmdDelAlterKey", question = "למחוק את השורה?";
        } else {
            f = std::make_unique<FrmAccDef>(folder, 1, ChoiceList{}, prompt, std::make_shared<ScriptedFileDialog>());
            table = "tAccountDef", button = "DelAccountDef", question = "למחוק את ההגדרה?";
        }
        const int before = scalar(items, "SELECT count(*) FROM " + table).toInt();
        if (left == -1)
            left = before;
        else
            left = before - 1;
        auto* grid = f->findChildren<BoundGrid*>().front();
        grid->setCurrentRowIndex(0);
        if (goneBefore)
            QVERIFY(!execOn(items, "DELETE FROM " + table + " WHERE " + (editor == "items" ? "ItemKey = 'K1'" : editor == "alter" ? "AccountKey = 'C5' AND ItemKey = 'A1'" : "AccountKey = 'A''1'")));
        prompt->queueAnswer(yes);
        click(*f, button);
        QVERIFY(!prompt->shown().empty());
        QCOMPARE(prompt->shown().front().text, question);
        QCOMPARE(prompt->shown().front().title, titles::Attention);
        QCOMPARE(scalar(items, "SELECT count(*) FROM " + table).toInt(), left);
        QCOMPARE(prompt->criticalCount(), errors);
        QCOMPARE(grid->model()->rowCount(), left);
    }

    void newAccountDefinition()
    {
        auto files = std::make_shared<ScriptedFileDialog>();
        FrmAccDef f(folder, 1, ChoiceList{{3, "מחירון 3"}}, prompt, files);
        click(f, "cmdAddAccount");
        click(f, "cmdAddAccount"); // definitions are keyed by their own counter
        QCOMPARE(rows(items, "SELECT AccountKey || '|' || LabelName || '|' || FldID || '|' || FldMaxLen || '|' || ifnull(Label2Name, '-')"
                             " FROM tAccountDef"),
                 QStringList(2, "כרטיס חדש|" + platformDefault("c:\\mylabel.lbl") + "|0|0|-"));
#ifndef Q_OS_WIN
        QVERIFY(!platformDefault("c:\\mylabel.lbl").startsWith("c:"));
#endif
        // The cell buttons: a chosen file goes to the cell, a cancel leaves it.
        files->queue("/labels/o'neil.lbl");
        f.chooseLabelFile(0, 6);
        f.chooseLabelFile(1, 3);
        QCOMPARE(rows(items, "SELECT LabelName || '|' || ifnull(Label2Name, '-') FROM tAccountDef ORDER BY DefID"),
                 (QStringList{platformDefault("c:\\mylabel.lbl") + "|/labels/o'neil.lbl", platformDefault("c:\\mylabel.lbl") + "|-"}));
        QCOMPARE(files->asked().front().filterIndex, 2);
        // Lists: the cell holds the number, shows the name.
        auto* grid = c<BoundGrid>(f, "VSAccountDef");
        QVERIFY(f.model()->setData(f.model()->index(0, 2), 3));
        QVERIFY(f.model()->setData(f.model()->index(0, 4), 4));
        QCOMPARE(grid->text(0, 2), QString("מחירון 3"));
        QCOMPARE(grid->text(0, 4), QString("בר-קוד חליפי"));
        QCOMPARE(rows(items, "SELECT PriceList || '|' || FldID FROM tAccountDef ORDER BY DefID").front(), QString("3|4"));
        QVERIFY(f.model()->setData(f.model()->index(0, 1), "O'Hara"));
        QCOMPARE(rows(items, "SELECT AccountKey FROM tAccountDef ORDER BY DefID").front(), QString("O'Hara"));
    }
};

QTEST_MAIN(TestEditors)
#include "tst_editors.moc"
