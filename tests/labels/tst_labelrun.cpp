// Label runs through the journal: the calls each program gets, in order.
#include "support/cardfixture.h"
#include "support/labeldata.h"

#include "labels/directlayout.h"
#include "labels/itemquery.h"
#include "labels/labelprograms.h"
#include "labels/labelrun.h"
#include "labels/programautomation.h"

#include <QCheckBox>
#include <QLineEdit>
#include <QPushButton>
#include <QRadioButton>
#include <QRegularExpression>
#include <QtTest>

using namespace tagora;

namespace {
const QString kLabel = QStringLiteral("/l/a.lbl");

QStringList readJournal(const QString& path, bool keepAnswers = false)
{
    QFile f(path);
    if (!f.open(QIODevice::ReadOnly))
        return {};
    QStringList lines = QString::fromUtf8(f.readAll()).split('\n', Qt::SkipEmptyParts);
    if (!keepAnswers)
        for (QString& l : lines)
            l.remove(QRegularExpression(" -> \\d+$"));
    return lines;
}

// A provider whose objects fail one member, as a program would reject a call.
class RefusingProvider : public AutomationProvider, public AutomationObject {
public:
    explicit RefusingProvider(QString refused) : m_refused(std::move(refused)) {}
    std::shared_ptr<AutomationObject> create(const QString&, QString*) override
    {
        return std::shared_ptr<AutomationObject>(this, [](AutomationObject*) {});
    }
    bool call(const QString& member, const QVariantList& args, QVariant* result, QString* error) override
    {
        if (result)
            *result = 42;
        if (member == m_refused && args.value(1) == QVariant("Price")) {
            *error = "Variable not found";
            return false;
        }
        return true;
    }
    std::shared_ptr<AutomationObject> object(const QString&, const QVariantList&, QString*) override
    {
        return std::shared_ptr<AutomationObject>(this, [](AutomationObject*) {});
    }
    bool setProperty(const QString&, const QVariant&, QString*) override { return true; }

private:
    QString m_refused;
};
} // namespace

class TestLabelRun : public QObject {
    Q_OBJECT
    QTemporaryDir work;
    int runs = 0;

    struct Outcome {
        LabelRunResult result;
        QStringList journal;
    };

    LabelRunRequest request(const LabelData& data, int code, int queryType = 1, const QString& range = " And ItemKey <= 'A2'")
    {
        LabelQuerySettings q;
        q.itemRangeCriteria = range;
        LabelRunRequest r;
        r.defaultLabel = kLabel;
        r.programCode = code;
        r.dbPath = data.docs;
        r.sql = BuildItemQuery(q, queryType, 1);
        r.priceFormat = "0.00";
        r.fields = {{"ItemKey", "ItemKey", false}, {"Price", "Price", true}};
        return r;
    }

    Outcome run(const LabelRunRequest& r, std::shared_ptr<AutomationProvider> provider = {}, bool journal = true)
    {
        const QString path = work.filePath(QStringLiteral("journal%1.txt").arg(++runs));
        AutomationRegistry registry;
        if (provider)
            registry.add(LabelProgram::progId(r.programCode), provider);
        if (journal)
            registry.setFallback(std::make_shared<JournalProvider>(path));
        Outcome o{RunLabelProgram(r, registry, nullptr, {}), {}};
        o.journal = readJournal(path);
        return o;
    }

    // A control printing from data's folder through a journal of its own, at *journal.
    std::unique_ptr<CardFixture> journalCard(const LabelData& data, QString* journal, const QString& general = {})
    {
        *journal = work.filePath(QStringLiteral("card%1.txt").arg(++runs));
        return std::make_unique<CardFixture>(
            QStringLiteral("[Automation]\nJournalFile=%1\n[GeneralParams]\nDBPath=%2\n%3").arg(*journal, data.folder, general).toUtf8());
    }

private slots:
    // Two records of one label file: every program's calls, in order.
    void callsPerProgram_data()
    {
        QTest::addColumn<int>("code");
        QTest::addColumn<bool>("sheets");
        QTest::addColumn<QStringList>("calls");
        const QString n = "NiceLabel.Application.";
        QTest::newRow("NiceLabel roll") << 5 << false << QStringList{
            "create NiceLabel.Application", n + "LabelOpen(\"/l/a.lbl\")",
            n + "LabelSetVar(2, \"ItemKey\", \"A1\", -9999, -9999)", n + "LabelSetVar(2, \"Price\", \"5.00\", -9999, -9999)",
            n + "LabelPrint(2, \"2,0\")",
            n + "LabelSetVar(2, \"ItemKey\", \"A2\", -9999, -9999)", n + "LabelSetVar(2, \"Price\", \"1.50\", -9999, -9999)",
            n + "LabelPrint(2, \"1,0\")", n + "LabelClose(2)", n + "Quit()", "release NiceLabel.Application"};
        QTest::newRow("NiceLabel sheets") << 5 << true << QStringList{
            "create NiceLabel.Application", n + "LabelOpen(\"/l/a.lbl\")", n + "LabelSessionStart(2)",
            n + "LabelSetVar(2, \"ItemKey\", \"A1\", -9999, -9999)", n + "LabelSetVar(2, \"Price\", \"5.00\", -9999, -9999)",
            n + "LabelSessionPrint(2, \"2,0\")",
            n + "LabelSetVar(2, \"ItemKey\", \"A2\", -9999, -9999)", n + "LabelSetVar(2, \"Price\", \"1.50\", -9999, -9999)",
            n + "LabelSessionPrint(2, \"1,0\")", n + "LabelSessionEnd(2)", n + "LabelClose(2)", n + "Quit()",
            "release NiceLabel.Application"};
        const QString d = "LPPX.Application.ActiveDocument";
        QTest::newRow("CodeSoft") << 2 << false << QStringList{
            "create LPPX.Application", "LPPX.Application.Visible = False", d, d + ".Open(\"/l/a.lbl\")",
            d + ".Variables(\"ItemKey\")", d + ".Variables(\"ItemKey\").Value = \"A1\"",
            d + ".Variables(\"Price\")", d + ".Variables(\"Price\").Value = \"5.00\"", d + ".PrintLabel(2)",
            d + ".Variables(\"ItemKey\")", d + ".Variables(\"ItemKey\").Value = \"A2\"",
            d + ".Variables(\"Price\")", d + ".Variables(\"Price\").Value = \"1.50\"", d + ".PrintLabel(1)",
            d + ".FormFeed()", "release LPPX.Application"};
        const QString f = "BarTender.Application.Formats.Open(\"/l/a.lbl\", False, \"\")";
        QTest::newRow("BarTender") << 4 << false << QStringList{
            "create BarTender.Application", "BarTender.Application.Visible = False", "BarTender.Application.Formats", f,
            f + ".SetNamedSubStringValue(\"ItemKey\", \"A1\")", f + ".SetNamedSubStringValue(\"Price\", \"5.00\")",
            f + ".IdenticalCopiesOfLabel = 2", f + ".PrintOut(True, False)",
            f + ".SetNamedSubStringValue(\"ItemKey\", \"A2\")", f + ".SetNamedSubStringValue(\"Price\", \"1.50\")",
            f + ".IdenticalCopiesOfLabel = 1", f + ".PrintOut(True, False)",
            "BarTender.Application.Quit(1)", "release BarTender.Application"};
        const QString x = "FastLabel.FastLabelX.";
        QTest::newRow("FastLabel") << 7 << false << QStringList{
            "create FastLabel.FastLabelX", x + "LabelOpen(\"/l/a.lbl\", \"\")",
            x + "LabelSetVar(\"ItemKey\", \"A1\")", x + "LabelSetVar(\"Price\", \"5.00\")", x + "LabelQty = 2",
            x + "AddRecord()", x + "LabelSetVar(\"ItemKey\", \"A2\")", x + "LabelSetVar(\"Price\", \"1.50\")",
            x + "LabelQty = 1", x + "LabelPrint()", "release FastLabel.FastLabelX"};
    }
    void callsPerProgram()
    {
        QFETCH(int, code);
        QFETCH(bool, sheets);
        QFETCH(QStringList, calls);
        LabelData data;
        LabelRunRequest r = request(data, code);
        r.sheets = sheets;
        const Outcome o = run(r);
        QCOMPARE(int(o.result.status), int(LabelRunResult::Status::Done));
        QCOMPARE(o.journal, calls);
    }

    // The id a program hands back from its open call is the one used after it.
    void labelIdFollowsOpen()
    {
        LabelData data;
        const QString path = work.filePath("ids.txt");
        QFile pre(path);
        QVERIFY(pre.open(QIODevice::WriteOnly) && pre.write("an earlier run\nand another\n") > 0);
        pre.close();
        AutomationRegistry registry;
        registry.setFallback(std::make_shared<JournalProvider>(path));
        QCOMPARE(int(RunLabelProgram(request(data, 5), registry, nullptr, {}).status), int(LabelRunResult::Status::Done));
        const QStringList lines = readJournal(path, true);
        QCOMPARE(lines[3], QString("NiceLabel.Application.LabelOpen(\"/l/a.lbl\") -> 4"));
        QVERIFY(lines[4].startsWith("NiceLabel.Application.LabelSetVar(4, "));
    }

    // Which file each record is printed with, by documents: the account's own
    // label (the second one for a long value), the header label before each
    // document. FastLabel prints what it collected before it opens another file.
    void labelFiles_data()
    {
        QTest::addColumn<int>("code");
        QTest::addColumn<int>("fieldId");
        QTest::addColumn<bool>("header");
        QTest::addColumn<QStringList>("events");
        QTest::newRow("second label by barcode length") << 5 << 2 << false << QStringList{
            "open /l/own.lbl", "print 4", "close", "open /l/long.lbl", "print 1", "close", "open /l/a.lbl", "print 2", "close"};
        QTest::newRow("no field: always the account's") << 5 << 0 << false << QStringList{
            "open /l/own.lbl", "print 4", "print 1", "close", "open /l/a.lbl", "print 2", "close"};
        QTest::newRow("header label per document") << 5 << -1 << true << QStringList{
            "open /l/head.lbl", "print 1", "close", "open /l/a.lbl", "print 4", "print 1", "close", "open /l/head.lbl",
            "print 1", "close", "open /l/a.lbl", "print 2", "close"};
        QTest::newRow("FastLabel, record labels") << 7 << 2 << false << QStringList{
            "open /l/own.lbl", "qty 4", "print", "open /l/long.lbl", "qty 1", "print", "open /l/a.lbl", "qty 2", "print"};
        QTest::newRow("FastLabel, with header labels") << 7 << 2 << true << QStringList{
            "open /l/head.lbl", "qty 1", "print", "open /l/own.lbl", "qty 4", "print", "open /l/long.lbl", "qty 1",
            "print", "open /l/head.lbl", "qty 1", "print", "open /l/a.lbl", "qty 2", "print"};
    }
    void labelFiles()
    {
        QFETCH(int, code);
        QFETCH(int, fieldId);
        QFETCH(bool, header);
        QFETCH(QStringList, events);
        LabelData data(fieldId < 0 ? QString()
                                   : QStringLiteral("UPDATE tAccountDef SET LabelName = '/l/own.lbl', FldID = %1,"
                                                    " FldMaxLen = 13, Label2Name = '/l/long.lbl'").arg(fieldId));
        LabelRunRequest r = request(data, code, 2, {});
        r.printHeader = header;
        r.headerLabel = "/l/head.lbl";
        const Outcome o = run(r);
        QCOMPARE(int(o.result.status), int(LabelRunResult::Status::Done));
        QStringList seen;
        for (const QString& l : o.journal) {
            if (l.contains(".LabelOpen("))
                seen << "open " + l.section('"', 1, 1);
            else if (l.endsWith(".LabelPrint()"))
                seen << "print";
            else if (l.contains(".LabelPrint("))
                seen << "print " + l.section('"', 1, 1).section(',', 0, 0);
            else if (l.contains(".LabelClose("))
                seen << "close";
            else if (l.contains(".LabelQty = "))
                seen << "qty " + l.section(" = ", 1);
        }
        QCOMPARE(seen, events);
    }

    // One call or assignment as its journal line: texts escaped, numbers
    // bare, the line's number as the answer.
    void journalLine_data()
    {
        QTest::addColumn<QString>("member");
        QTest::addColumn<QVariantList>("args");
        QTest::addColumn<bool>("property");
        QTest::addColumn<QString>("line");
        const QString p = "NiceLabel.Application.";
        QTest::newRow("call") << "LabelSetVar" << QVariantList{qlonglong(2), "Price", "5.00", -9999, -9999} << false
                              << p + "LabelSetVar(2, \"Price\", \"5.00\", -9999, -9999) -> 2";
        QTest::newRow("no arguments") << "Quit" << QVariantList{} << false << p + "Quit() -> 2";
        // A value that looks like a placeholder is text: the answer stays after the arrow.
        QTest::newRow("placeholder in a value") << "LabelSetVar" << QVariantList{"Size", "10%1"} << false
                                                << p + "LabelSetVar(\"Size\", \"10%1\") -> 2";
        QTest::newRow("escapes") << "LabelSetVar" << QVariantList{"a\"b\\c\nd\re\tf"} << false
                                 << p + "LabelSetVar(\"a\\\"b\\\\c\\nd\\re\\tf\") -> 2";
        QTest::newRow("hebrew, null, boolean, double") << "Open" << QVariantList{"פריט", QVariant(), true, 2.5} << false
                                                       << p + "Open(\"פריט\", Null, True, 2.5) -> 2";
        QTest::newRow("beyond the basic plane") << "LabelSetVar" << QVariantList{"a\U0001F600b"} << false
                                                << p + "LabelSetVar(\"a\U0001F600b\") -> 2";
        // A lone surrogate is no character: the journal writes '?' for it, as Qt's encoder does.
        QTest::newRow("lone surrogate") << "LabelSetVar" << QVariantList{QString("a") + QChar(0xD83D) + "\"b", QString(QChar(0xDE00))}
                                        << false << p + "LabelSetVar(\"a?\\\"b\", \"?\") -> 2";
        // Longer than the journal's buffer.
        QTest::newRow("long text") << "LabelSetVar" << QVariantList{QString(70000, 'x')} << false
                                   << p + "LabelSetVar(\"" + QString(70000, 'x') + "\") -> 2";
        QTest::newRow("property") << "LabelQty" << QVariantList{3} << true << p + "LabelQty = 3";
        QTest::newRow("text property") << "Name" << QVariantList{"50%"} << true << p + "Name = \"50%\"";
    }
    void journalLine()
    {
        QFETCH(QString, member);
        QFETCH(QVariantList, args);
        QFETCH(bool, property);
        QFETCH(QString, line);
        const QString path = work.filePath(QStringLiteral("line%1.txt").arg(++runs));
        {
            JournalProvider journal(path);
            QString error;
            auto app = journal.create("NiceLabel.Application", &error);
            QVERIFY(app);
            QVariant answer;
            QVERIFY(property ? app->setProperty(member, args.value(0), &error)
                             : app->call(member, args, &answer, &error));
            if (!property)
                QCOMPARE(answer.toLongLong(), 2);
        }
        QCOMPARE(readJournal(path, true),
                 (QStringList{"create NiceLabel.Application", line, "release NiceLabel.Application"}));
    }

    // Events run during a run, between a record's variables and its print,
    // but not necessarily for every record.
    void eventsPumpedDuringRun()
    {
        LabelData data;
        const QString path = work.filePath(QStringLiteral("pump%1.txt").arg(++runs));
        AutomationRegistry registry;
        registry.setFallback(std::make_shared<JournalProvider>(path));
        int pumps = 0;
        const LabelRunRequest r = request(data, 5);
        const LabelRunResult result = RunLabelProgram(r, registry, nullptr, [&] { ++pumps; });
        QCOMPARE(int(result.status), int(LabelRunResult::Status::Done));
        const QStringList journal = readJournal(path);
        const int records = int(journal.filter(".LabelPrint(").size());
        QVERIFY(pumps >= 1);
        QVERIFY(pumps <= records);
    }

    void nullSentAsEmptyText()
    {
        LabelData data;
        LabelRunRequest r = request(data, 7, 1, " And ItemKey = 'B1'");
        r.fields = {{"BarCode", "BarCode", false}, {"AltItemPrice", "Price", true}};
        const Outcome o = run(r);
        QVERIFY(o.journal.contains("FastLabel.FastLabelX.LabelSetVar(\"BarCode\", \"\")"));
        QVERIFY(o.journal.contains("FastLabel.FastLabelX.LabelSetVar(\"AltItemPrice\", \"0.25\")"));
    }

    void failures_data()
    {
        QTest::addColumn<int>("code");
        QTest::addColumn<QString>("delay");
        QTest::addColumn<bool>("journal");
        QTest::addColumn<QString>("refused");
        QTest::addColumn<QString>("tail");
        QTest::newRow("delay not a number") << 5 << "abc" << true << "" << " In Line 0, LabelID = 0, Var = , Value = ";
        QTest::newRow("no provider") << 5 << "" << false << "" << " In Line 2, LabelID = 0, Var = , Value = ";
        QTest::newRow("no program for the code") << 6 << "" << true << "" << " In Line 2, LabelID = 0, Var = , Value = ";
        QTest::newRow("a call refused") << 5 << "" << false << "LabelSetVar" << " In Line 7, LabelID = 42, Var = Price, Value = 5.00";
    }
    void failures()
    {
        QFETCH(int, code);
        QFETCH(QString, delay);
        QFETCH(bool, journal);
        QFETCH(QString, refused);
        QFETCH(QString, tail);
        LabelData data;
        LabelRunRequest r = request(data, code);
        r.delayText = delay;
        std::shared_ptr<AutomationProvider> provider;
        if (!refused.isEmpty())
            provider = std::make_shared<RefusingProvider>(refused);
        const Outcome o = run(r, provider, journal);
        QCOMPARE(int(o.result.status), int(LabelRunResult::Status::Failed));
        QVERIFY2(o.result.message.endsWith(tail), qPrintable(o.result.message));
        QVERIFY(o.result.message.length() > tail.length());
        if (delay == "abc")
            QVERIFY(o.journal.isEmpty());
    }

    void noRecordsCreatesNothing()
    {
        LabelData data;
        const Outcome o = run(request(data, 5, 1, " And ItemKey = 'none'"));
        QCOMPARE(int(o.result.status), int(LabelRunResult::Status::NoRecords));
        QVERIFY(o.journal.isEmpty());
    }

    // Runs of any length: a count kept in 16 bits would stop at 32,768.
    void longRun()
    {
        LabelData data("WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < 32800)"
                       " INSERT INTO tItems (ItemKey, Copies, PrintLabel) SELECT printf('Z%05d', i), 1, 1 FROM n");
        LabelRunRequest r = request(data, 7, 1, " And ItemKey >= 'Z'");
        r.fields = {{"ItemKey", "ItemKey", false}};
        const Outcome o = run(r);
        QCOMPARE(int(o.result.status), int(LabelRunResult::Status::Done));
        QCOMPARE(o.journal.filter("LabelQty = ").size(), 32800);
        QVERIFY(o.journal.contains("FastLabel.FastLabelX.LabelSetVar(\"ItemKey\", \"Z32800\")"));
    }

    // The print button, with the order of the printer type.
    void printButton_data()
    {
        QTest::addColumn<bool>("roll");
        QTest::addColumn<QStringList>("keys");
        QTest::newRow("roll prints last to first") << true << QStringList{"B1", "A2", "A1"};
        QTest::newRow("sheets first to last") << false << QStringList{"A1", "A2", "B1"};
    }
    void printButton()
    {
        QFETCH(bool, roll);
        QFETCH(QStringList, keys);
        LabelData data;
        QString journal;
        const auto f = journalCard(data, &journal);
        f->c<QRadioButton>(roll ? "OptPrinter(1)" : "OptPrinter(0)")->setChecked(true);
        f->c<QCheckBox>("ChkFldSend(0)")->setChecked(true);
        f->c<QPushButton>("cmdPrintItmes")->click();
        QCOMPARE(f->prompt->lines(), QStringList());
        QCOMPARE(f->card->message(), QString::fromUtf8("הכנת המדבקות הסתיימה"));
        QStringList sent;
        for (const QString& l : readJournal(journal).filter("\"ItemKey\""))
            sent << l.section('"', 3, 3);
        QCOMPARE(sent, keys);
    }

    // A ticked expression row left blank is neither asked of the query nor sent.
    void blankExpressionRowIsNotSent()
    {
        LabelData data;
        QString journal;
        const auto f = journalCard(data, &journal);
        for (int row : {0, 33, 34})
            f->c<QCheckBox>(QStringLiteral("ChkFldSend(%1)").arg(row))->setChecked(true);
        f->c<QLineEdit>("txtFldExpr(33)")->setText(" ");
        f->c<QLineEdit>("txtFldExpr(34)")->setText("tItems.Unit");
        f->c<QPushButton>("cmdPrintItmes")->click();
        QCOMPARE(f->prompt->lines(), QStringList());
        QCOMPARE(f->card->message(), QString::fromUtf8("הכנת המדבקות הסתיימה"));
        const QStringList lines = readJournal(journal);
        QVERIFY(lines.filter("\"EX1\"").isEmpty());
        QCOMPARE(lines.filter("\"EX2\", \"pc\"").size(), 3);
    }

    // An expression with a ';' that ends the statement is refused before
    // anything is printed, in the same words whichever way the labels go.
    void statementEndRefusedOnBothPaths_data()
    {
        QTest::addColumn<bool>("direct");
        QTest::newRow("label program") << false;
        QTest::newRow("direct labels") << true;
    }
    void statementEndRefusedOnBothPaths()
    {
        QFETCH(bool, direct);
        LabelData data;
        qputenv("Temp", work.filePath(QStringLiteral("temp%1").arg(runs)).toUtf8());
        QString journal;
        const auto f = journalCard(data, &journal,
                                   QStringLiteral("OptOLE0=%1\nOptOLE3=%2\n[LabelDef0]\nUseCell=-1\nFldID=0\n")
                                       .arg(direct ? "False" : "True", direct ? "True" : "False"));
        const QString expression = QStringLiteral("1) AS EX1 FROM tItems; SELECT (1");
        f->c<QCheckBox>("ChkFldSend(0)")->setChecked(true);
        f->c<QCheckBox>("ChkFldSend(33)")->setChecked(true);
        f->c<QLineEdit>("txtFldExpr(33)")->setText(expression);
        f->c<QPushButton>("cmdPrintItmes")->click();
        directLabelLayout() = DirectLabelLayout{};
        qunsetenv("Temp");

        LabelQuerySettings settings;
        settings.sent[33] = true;
        settings.expressions[33] = expression;
        QCOMPARE(f->prompt->lines(), QStringList{QString::fromUtf8("תקלה: ") + CheckItemQuery(settings)});
        QVERIFY(f->pages->shown.isEmpty());
        QVERIFY(readJournal(journal).isEmpty());
        QVERIFY(f->card->message() != QString::fromUtf8("הכנת המדבקות הסתיימה"));
    }
};

QTEST_MAIN(TestLabelRun)
#include "tst_labelrun.moc"
