#include "support/dbrows.h"

#include "dialogs/boundgrid.h"
#include "dialogs/frmdoctype.h"
#include "dialogs/frmeditranges.h"
#include "dialogs/frmselectdocitem.h"
#include "localdb/database.h"
#include "localdb/schema.h"
#include "platform/prompt.h"

#include <QAbstractItemModelTester>
#include <QPushButton>
#include <QRadioButton>
#include <QTemporaryDir>
#include <QtTest>

using namespace tagora;

namespace {
struct RecordingCommands : ControlCommands {
    QStringList asked;
    void showItemCard(const QString& itemKey, bool fromErp) override
    {
        asked << QStringLiteral("card %1 %2").arg(itemKey, fromErp ? "erp" : "local");
    }
    void printMarkedItems() override { asked << QStringLiteral("print"); }
};

template <class T> T* c(QWidget& w, const QString& name) { return w.findChild<T*>(name); }

void click(QWidget& w, const QString& button) { c<QPushButton>(w, button)->click(); }
} // namespace

class TestDocDialogs : public QObject {
    Q_OBJECT
    QTemporaryDir dir;
    QString folder;
    QString config;
    QString docs;

    // "WizFileID/Number:Include" of every document, and "key:Include:Copies" of every line.
    QString headerMarks() const
    {
        return rows(docs, "SELECT WizFileID || '/' || Number || ':' || Include FROM tTempDocHeaders"
                          " ORDER BY WizFileID DESC, Number").join(',');
    }
    QString lineMarks() const
    {
        return rows(docs, "SELECT ItemKey || ':' || Include || ':' || Copies FROM tTempDocLines ORDER BY ItemKey").join(',');
    }
    static QString lineKeys(FrmSelectDocItem& f)
    {
        QStringList out;
        for (int r = 0; r < f.linesModel()->rowCount(); ++r)
            out << f.linesModel()->value(r, "ItemKey").toString();
        return out.join(',');
    }

private slots:
    void initTestCase()
    {
        folder = dir.filePath("data");
        QVERIFY(!PrepareDataFolder(folder));
        config = folder + "/" + dbfiles::Config;
        docs = folder + "/" + dbfiles::TempDocs;
        DbError e;
        QVERIFY(!CreateTempDocsDB(config, folder + "/" + dbfiles::Items, docs, &e).isEmpty());
    }

    // Three documents listed in this order; two of them share the number 10
    // under different recipes, and one has no lines.
    void init()
    {
        const DbError e = execOn(docs,
                        "DELETE FROM tTempDocHeaders; DELETE FROM tTempDocLines;"
                        "INSERT INTO tTempDocHeaders (WizFileID, Number, DocType, Reference1, DocDate, AccountKey, Include, CardName) VALUES"
                        " (2, 10, 1, 'SO0001', '2026-03-05 00:00:00', 'C100', 1, 'לקוח ראשון'),"
                        " (2, 11, 1, 'SO0002', '2025-12-31T08:30:00', 'C200', 0, 'Acme Ltd'),"
                        " (2, 12, 1, 'SO0003', '2026-01-01', 'C200', 0, 'Acme Ltd'),"
                        " (1, 10, 3, 'DN0007', '2026-01-09', 'C100', 1, 'לקוח ראשון');"
                        "INSERT INTO tTempDocLines (WizFileID, HeadNumber, LineNum, ItemKey, ItemNameSon, Quantity, Warehouse, Copies, Include) VALUES"
                        " (2, 10, 2, 'B2', 'ברגים', 2.5, 1, 2, 0), (2, 10, 1, 'A1', 'אומים', 1, 1, 1, 1),"
                        " (2, 11, 1, 'C3', 'Nut', 4, 2, 4, 1),"
                        " (1, 10, 1, 'D4', 'x', 1, 1, 1, 0), (1, 10, 2, 'E5', 'y', 3, 1, 3, 1), (1, 10, 3, 'F6', 'z', 1, 1, 1, 1)");
        QVERIFY2(!e, qPrintable(e.message));
        QVERIFY(!execOn(config, "UPDATE tDocTypes SET Include = DocType IN (1, 3), IncludeDraft = DocType = 5;"
                                "UPDATE tWizFileRanges SET LastIndx = WizFileID * 100, FromIndx = WizFileID * 100 + 1"));
    }

    void currentDocumentDrivesLines_data()
    {
        QTest::addColumn<int>("row");
        QTest::addColumn<QString>("date");
        QTest::addColumn<QString>("lines");
        QTest::newRow("first document") << 0 << "05/03/26" << "A1,B2";
        QTest::newRow("second, date with a time") << 1 << "31/12/25" << "C3";
        QTest::newRow("document without lines") << 2 << "01/01/26" << "";
        QTest::newRow("same number, other recipe") << 3 << "09/01/26" << "D4,E5,F6";
    }
    void currentDocumentDrivesLines()
    {
        QFETCH(int, row);
        QFETCH(QString, date);
        QFETCH(QString, lines);
        FrmSelectDocItem f(folder, nullptr);
        QAbstractItemModelTester tester(f.linesModel(), QAbstractItemModelTester::FailureReportingMode::QtTest);
        auto* headers = c<BoundGrid>(f, "VSDocHeaders");
        QCOMPARE(lineKeys(f), QString("A1,B2"));
        // Away and back, so every row is reached by a move.
        headers->setCurrentRowIndex(row == 0 ? 1 : 0);
        headers->setCurrentRowIndex(row);
        QCOMPARE(lineKeys(f), lines);
        QCOMPARE(headers->text(row, 3), date);
        for (int col = 0; col < 9; ++col)
            QCOMPARE(headers->isColumnHidden(col), col == 0 || col >= 7);
    }

    void marks_data()
    {
        QTest::addColumn<int>("row");
        QTest::addColumn<QString>("button");
        QTest::addColumn<QString>("headers");
        QTest::addColumn<QString>("lines");
        const QString lines = "A1:1:1,B2:0:2,C3:1:4,D4:0:1,E5:1:3,F6:1:1";
        QTest::newRow("mark all documents") << 0 << "CmdAllHeaders" << "2/10:1,2/11:1,2/12:1,1/10:1" << lines;
        // Their lines keep their marks, to print again when the documents are marked.
        QTest::newRow("clear all documents") << 0 << "cmdNoneHeaders" << "2/10:0,2/11:0,2/12:0,1/10:0" << lines;
        QTest::newRow("mark the current document's lines") << 3 << "CmdAllLines" << "2/10:1,2/11:0,2/12:0,1/10:1"
                                                           << "A1:1:1,B2:0:2,C3:1:4,D4:1:1,E5:1:3,F6:1:1";
        QTest::newRow("clear the current document's lines") << 0 << "cmdNoneLines" << "2/10:1,2/11:0,2/12:0,1/10:1"
                                                            << "A1:0:1,B2:0:2,C3:1:4,D4:0:1,E5:1:3,F6:1:1";
        QTest::newRow("lines of a document without lines") << 2 << "CmdAllLines" << "2/10:1,2/11:0,2/12:0,1/10:1" << lines;
    }
    void marks()
    {
        QFETCH(int, row);
        QFETCH(QString, button);
        QFETCH(QString, headers);
        QFETCH(QString, lines);
        auto prompt = std::make_shared<ScriptedPrompt>(nullptr);
        FrmSelectDocItem f(folder, nullptr, prompt);
        c<BoundGrid>(f, "VSDocHeaders")->setCurrentRowIndex(row);
        click(f, button);
        QCOMPARE(headerMarks(), headers);
        QCOMPARE(lineMarks(), lines);
        QCOMPARE(prompt->criticalCount(), 0);
    }

    // Ticks and copies typed in the grids reach the file; a copies value the
    // column refuses is said, and the line keeps what it had.
    void cellEdits_data()
    {
        QTest::addColumn<int>("column");
        QTest::addColumn<QVariant>("typed");
        QTest::addColumn<QString>("lines");
        QTest::addColumn<int>("refused");
        QTest::newRow("copies") << 6 << QVariant("7") << "D4:0:1,E5:1:7,F6:1:1" << 0;
        QTest::newRow("no copies") << 6 << QVariant("0") << "D4:0:1,E5:1:0,F6:1:1" << 0;
        QTest::newRow("copies not a number") << 6 << QVariant("abc") << "D4:0:1,E5:1:3,F6:1:1" << 1;
        QTest::newRow("negative copies") << 6 << QVariant("-2") << "D4:0:1,E5:1:3,F6:1:1" << 1;
        QTest::newRow("copies beyond 16 bits") << 6 << QVariant("40000") << "D4:0:1,E5:1:3,F6:1:1" << 1;
        QTest::newRow("untick a line") << 7 << QVariant(int(Qt::Unchecked)) << "D4:0:1,E5:0:3,F6:1:1" << 0;
    }
    void cellEdits()
    {
        QFETCH(int, column);
        QFETCH(QVariant, typed);
        QFETCH(QString, lines);
        QFETCH(int, refused);
        auto prompt = std::make_shared<ScriptedPrompt>(nullptr);
        FrmSelectDocItem f(folder, nullptr, prompt);
        c<BoundGrid>(f, "VSDocHeaders")->setCurrentRowIndex(3);
        const QModelIndex cell = f.linesModel()->index(1, column);
        f.linesModel()->setData(cell, typed, column == 7 ? Qt::CheckStateRole : Qt::EditRole);
        QCOMPARE(rows(docs, "SELECT ItemKey || ':' || Include || ':' || Copies FROM tTempDocLines WHERE WizFileID = 1"
                            " ORDER BY ItemKey").join(','),
                 lines);
        QCOMPARE(prompt->criticalCount(), refused);
    }

    // Lines that cannot be read for the new current document are not left in
    // view under it, where marking them would mark another document's lines.
    void unreadableLinesShowNothing()
    {
        auto prompt = std::make_shared<ScriptedPrompt>(nullptr);
        FrmSelectDocItem f(folder, nullptr, prompt);
        QCOMPARE(lineKeys(f), QString("A1,B2"));
        // The file goes away under the open dialog (another import rebuilding it, say).
        QVERIFY(QFile::rename(docs, docs + ".aside"));
        c<BoundGrid>(f, "VSDocHeaders")->setCurrentRowIndex(3);
        const int shown = f.linesModel()->rowCount();
        // Back in place first, so a failure here leaves the file to the next tests.
        QVERIFY(QFile::rename(docs + ".aside", docs));
        QCOMPARE(shown, 0);
        click(f, "CmdAllLines");
        QCOMPARE(lineMarks(), QString("A1:1:1,B2:0:2,C3:1:4,D4:0:1,E5:1:3,F6:1:1"));
    }

    void nothingImported_data()
    {
        QTest::addColumn<QString>("sql");
        QTest::newRow("no documents") << "DELETE FROM tTempDocHeaders; DELETE FROM tTempDocLines";
        QTest::newRow("no file") << "";
    }
    void nothingImported()
    {
        QFETCH(QString, sql);
        QTemporaryDir other;
        QString data = folder;
        if (sql.isEmpty())
            data = other.path();
        else
            QVERIFY(!execOn(docs, sql));
        auto prompt = std::make_shared<ScriptedPrompt>(nullptr);
        FrmSelectDocItem f(data, nullptr, prompt);
        QCOMPARE(f.headersModel()->rowCount(), 0);
        QCOMPARE(f.linesModel()->rowCount(), 0);
        click(f, "CmdAllHeaders");
        click(f, "CmdAllLines");
        QCOMPARE(prompt->criticalCount(), 0);
    }

    void itemCard_data()
    {
        QTest::addColumn<QString>("option");
        QTest::addColumn<int>("column");
        QTest::addColumn<QString>("asked");
        QTest::newRow("card from the ERP") << "OptItmCard(0)" << 0 << "card A1 erp";
        QTest::newRow("local card") << "OptItmCard(1)" << 0 << "card A1 local";
        QTest::newRow("outside the picture") << "OptItmCard(0)" << 2 << "";
    }
    void itemCard()
    {
        QFETCH(QString, option);
        QFETCH(int, column);
        QFETCH(QString, asked);
        RecordingCommands commands;
        FrmSelectDocItem f(folder, &commands);
        c<QRadioButton>(f, option)->setChecked(true);
        auto* lines = c<BoundGrid>(f, "VSDocLines");
        emit lines->clicked(f.linesModel()->index(0, column));
        QCOMPARE(commands.asked.join(';'), asked);
    }

    void docTypes_data()
    {
        QTest::addColumn<QString>("action");
        QTest::addColumn<QString>("stored");
        // Include and IncludeDraft of types 1 to 6.
        QTest::newRow("fetch a type") << "tick 1 2" << "111000|000010";
        QTest::newRow("drafts of a type") << "tick 0 3" << "101000|100010";
        QTest::newRow("untick drafts") << "untick 4 3" << "101000|000000";
        QTest::newRow("mark all fetches, drafts stay") << "cmdAllDocTypes" << "111111|000010";
        QTest::newRow("clear all") << "cmdNoDocTypes" << "000000|000010";
    }
    void docTypes()
    {
        QFETCH(QString, action);
        QFETCH(QString, stored);
        auto prompt = std::make_shared<ScriptedPrompt>(nullptr);
        FrmDocType f(folder, prompt);
        QCOMPARE(f.model()->rowCount(), 6);
        const QStringList a = action.split(' ');
        if (a[0] == "tick" || a[0] == "untick")
            QVERIFY(f.model()->setData(f.model()->index(a[1].toInt(), a[2].toInt()),
                                       a[0] == "tick" ? Qt::Checked : Qt::Unchecked, Qt::CheckStateRole));
        else
            click(f, action);
        QCOMPARE(rows(config, "SELECT group_concat(Include, '') || '|' || group_concat(IncludeDraft, '')"
                              " FROM (SELECT Include, IncludeDraft FROM tDocTypes ORDER BY DocType)").join(','),
                 stored);
        QCOMPARE(prompt->criticalCount(), 0);
    }

    void ranges_data()
    {
        QTest::addColumn<QString>("action");
        QTest::addColumn<QString>("stored");
        QTest::addColumn<int>("refused");
        // LastIndx/FromIndx of types 1 and 2.
        QTest::newRow("reset them all") << "cmdNoneItems" << "100/0,200/0" << 0;
        QTest::newRow("next read typed") << "0 3 55" << "100/55,200/201" << 0;
        QTest::newRow("last read typed") << "1 2 77" << "100/101,77/201" << 0;
        QTest::newRow("negative refused") << "0 3 -1" << "100/101,200/201" << 1;
    }
    void ranges()
    {
        QFETCH(QString, action);
        QFETCH(QString, stored);
        QFETCH(int, refused);
        auto prompt = std::make_shared<ScriptedPrompt>(nullptr);
        FrmEditRanges f(folder, prompt);
        QCOMPARE(f.model()->rowCount(), 6);
        QCOMPARE(c<BoundGrid>(f, "VSEditRange")->text(0, 1), QString("הזמנות לקוח"));
        const QStringList a = action.split(' ');
        if (a.size() == 3)
            f.model()->setData(f.model()->index(a[0].toInt(), a[1].toInt()), a[2], Qt::EditRole);
        else
            click(f, action);
        QCOMPARE(rows(config, "SELECT LastIndx || '/' || FromIndx FROM tWizFileRanges WHERE WizFileID <= 2"
                              " ORDER BY WizFileID").join(','),
                 stored);
        QCOMPARE(prompt->criticalCount(), refused);
        if (action == "cmdNoneItems")
            QCOMPARE(rows(config, "SELECT count(*) FROM tWizFileRanges WHERE FromIndx <> 0"), QStringList{"0"});
    }
};

QTEST_MAIN(TestDocDialogs)
#include "tst_docdialogs.moc"
