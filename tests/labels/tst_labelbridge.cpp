// The bridge answers each label program's calls; whichever program the
// adapter drives, a bridge's sink hears the same labels in the same order.
#include "support/labeldata.h"

#include "labels/itemquery.h"
#include "labels/labelbridge.h"
#include "labels/labelprograms.h"
#include "labels/labelrun.h"

#include <QtTest>

using namespace tagora;

namespace {
// Writes down what it is told; refuses one variable when asked to, as a
// template without that field does.
class RecordingSink : public LabelSink {
public:
    RecordingSink(QStringList* log, QString refused) : m_log(log), m_refused(std::move(refused)) {}
    bool openLabel(const QString& file, QString*) override { return note("open " + file); }
    bool setVariable(const QString& name, const QString& value, QString* error) override
    {
        if (name == m_refused) {
            *error = "no field " + name;
            return false;
        }
        return note(name + "=" + value);
    }
    bool printRecord(int copies, QString*) override { return note("print " + QString::number(copies)); }
    bool closeLabel(QString*) override { return note("close"); }

private:
    bool note(const QString& line)
    {
        *m_log << line;
        return true;
    }
    QStringList* m_log;
    QString m_refused;
};
} // namespace

class TestLabelBridge : public QObject {
    Q_OBJECT

    LabelRunResult run(int code, bool sheets, QStringList* log, const QString& refused = {})
    {
        LabelData data;
        LabelRunRequest r;
        r.defaultLabel = "/l/item.glabels";
        r.programCode = code;
        r.dbPath = data.docs;
        r.sql = BuildItemQuery(LabelQuerySettings(), QueryByDocuments, OrderAscending);
        r.priceFormat = "0.00";
        r.sheets = sheets;
        r.printHeader = true;
        r.headerLabel = "/l/head.glabels";
        r.fields = {{"ItemKey", "ItemKey", false}, {"Price", "Price", true}};
        AutomationRegistry registry;
        registry.add(LabelProgram::progId(code), std::make_shared<BridgeProvider>([&](const QString&) {
                         return std::make_unique<RecordingSink>(log, refused);
                     }));
        return RunLabelProgram(r, registry, nullptr, {});
    }

private slots:
    void programs_data()
    {
        QTest::addColumn<int>("code");
        QTest::addColumn<bool>("sheets");
        QTest::newRow("CodeSoft") << 2 << false;
        QTest::newRow("BarTender") << 4 << false;
        QTest::newRow("NiceLabel roll") << 5 << false;
        QTest::newRow("NiceLabel sheets") << 5 << true;
        QTest::newRow("FastLabel") << 7 << false;
    }

    // By documents with header labels: each document's header, then its
    // lines with their copies; every file is closed before the next opens,
    // and the last one at the end, so what a sink collects always goes out.
    void programs()
    {
        QFETCH(int, code);
        QFETCH(bool, sheets);
        QStringList log;
        const LabelRunResult result = run(code, sheets, &log);
        QCOMPARE(int(result.status), int(LabelRunResult::Status::Done));
        const QStringList head100{"open /l/head.glabels", "ItemKey=A1", "Price=5.00", "print 1", "close"};
        const QStringList head101{"open /l/head.glabels", "ItemKey=B1", "Price=0.25", "print 1", "close"};
        const QStringList lines100{"open /l/item.glabels", "ItemKey=A1", "Price=5.00", "print 4",
                                   "ItemKey=A2", "Price=1.50", "print 1", "close"};
        const QStringList lines101{"open /l/item.glabels", "ItemKey=B1", "Price=0.25", "print 2", "close"};
        QCOMPARE(log, head100 + lines100 + head101 + lines101);
    }

    void refusedVariable_data() { programs_data(); }
    // A variable the label cannot take ends the run at that variable, and
    // nothing collected is sent afterwards.
    void refusedVariable()
    {
        QFETCH(int, code);
        QFETCH(bool, sheets);
        QStringList log;
        const LabelRunResult result = run(code, sheets, &log, "Price");
        QCOMPARE(int(result.status), int(LabelRunResult::Status::Failed));
        QVERIFY2(result.message.contains("no field Price") && result.message.contains("Var = Price"),
                 qPrintable(result.message));
        QCOMPARE(log, QStringList({"open /l/head.glabels", "ItemKey=A1"}));
    }

    // Members a program does not have are refused by name.
    void unknownMember()
    {
        QStringList log;
        BridgeProvider provider([&](const QString&) { return std::make_unique<RecordingSink>(&log, QString()); });
        QString error;
        auto app = provider.create("NiceLabel.Application", &error);
        QVERIFY(app);
        QVERIFY(!app->call("LabelExport", {}, nullptr, &error));
        QVERIFY(error.contains("LabelExport"));
        QVERIFY(!provider.create("Other.Application", &error));
    }
};

QTEST_MAIN(TestLabelBridge)
#include "tst_labelbridge.moc"
