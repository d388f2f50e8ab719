// Which output the settings choose for each program, and the general tab's
// line that names it following the program, the printer and the settings.
#include "support/cardfixture.h"

#include "control/outputchoice.h"
#include "labels/directlayout.h"

#include <QLabel>
#include <QRadioButton>
#include <QtTest>

using namespace tagora;

class TestOutputChoice : public QObject {
    Q_OBJECT

private slots:
    void settingsChooseBridge_data()
    {
        QTest::addColumn<QString>("ini");
        QTest::addColumn<int>("code");
        QTest::addColumn<QString>("bridge");
        QTest::addColumn<int>("timeout");
        QTest::newRow("for all, any case") << "Bridge=GLabels\nTimeout=15\n" << 2 << "glabels" << 15;
        QTest::newRow("program key wins") << "Bridge=glabels\nBarTender.Application=zpl\n" << 4 << "zpl" << 60;
        QTest::newRow("other program's key ignored") << "Bridge=glabels\nBarTender.Application=zpl\n" << 7 << "glabels" << 60;
        QTest::newRow("empty program key falls back") << "Bridge=zpl\nNiceLabel.Application=\n" << 5 << "zpl" << 60;
        QTest::newRow("nothing usable set") << "Timeout=soon\n" << 5 << QString() << 60;
    }

    void settingsChooseBridge()
    {
        QFETCH(QString, ini);
        QFETCH(int, code);
        QFETCH(QString, bridge);
        QFETCH(int, timeout);
        QTemporaryDir dir;
        const QString path = dir.filePath(QStringLiteral("Tagora.ini"));
        QFile f(path);
        QVERIFY(f.open(QIODevice::WriteOnly));
        f.write(("[Automation]\n" + ini).toUtf8());
        f.close();
        IniSettingsStore store(path);
        const OutputSettings s = ReadOutputSettings(store, code);
        QCOMPARE(s.bridge, bridge);
        QCOMPARE(s.timeoutSeconds, timeout);
    }

    // What the line must name, not its wording.
    void lineNamesTheOutput_data()
    {
        QTest::addColumn<int>("code");
        QTest::addColumn<QString>("bridge");
        QTest::addColumn<QString>("zplHost");
        QTest::addColumn<QString>("printer");
        QTest::addColumn<bool>("autoPrint");
        QTest::addColumn<QStringList>("names");
        QTest::addColumn<QStringList>("notNames");
        QTest::newRow("unknown bridge is named") << 5 << "cups" << "" << "P1" << false << QStringList{"cups"} << QStringList{"journal"};
        QTest::newRow("zpl, nowhere chosen") << 7 << "zpl" << "" << "" << false << QStringList{"ZPL", "תיקיית העבודה"} << QStringList{};
        QTest::newRow("glabels, no printer") << 2 << "glabels" << "" << "" << false << QStringList{"gLabels", "PDF"} << QStringList{};
        QTest::newRow("direct, auto print, printer") << 6 << "" << "" << "P1" << true << QStringList{"PDF", "P1"} << QStringList{};
    }

    void lineNamesTheOutput()
    {
        QFETCH(int, code);
        QFETCH(QString, bridge);
        QFETCH(QString, zplHost);
        QFETCH(QString, printer);
        QFETCH(bool, autoPrint);
        QFETCH(QStringList, names);
        QFETCH(QStringList, notNames);
        OutputSettings s;
        s.bridge = bridge;
        s.zplHost = zplHost;
        const QString line = OutputDescription(code, s, printer, autoPrint);
        for (const QString& n : names)
            QVERIFY2(line.contains(n), qPrintable(line));
        for (const QString& n : notNames)
            QVERIFY2(!line.contains(n), qPrintable(line));
    }

    // The tab's line follows the program and the printer as they are chosen.
    void tabLineFollowsChoices()
    {
        CardFixture f("[GeneralParams]\nOptOLE0=True\n[Automation]\nBridge=glabels\nLPPX.Application=zpl\nZplHost=h:9100\n",
                      {"P1", "P2"});
        auto* line = f.c<QLabel>("lblOutput");
        auto* printers = f.c<QComboBox>("cmbPrinter");
        printers->setCurrentIndex(printers->findText("P2"));
        QVERIFY2(line->text().contains("gLabels") && line->text().contains("P2"), qPrintable(line->text()));
        f.c<QRadioButton>("OptOLE(1)")->setChecked(true);
        // The host, not the printer, takes the labels.
        QVERIFY2(line->text().contains("h:9100") && !line->text().contains("P2"), qPrintable(line->text()));
        f.c<QRadioButton>("OptOLE(3)")->setChecked(true);
        QVERIFY2(line->text().contains("דפדפן"), qPrintable(line->text()));
        directLabelLayout() = DirectLabelLayout{};
    }
};

QTEST_MAIN(TestOutputChoice)
#include "tst_outputchoice.moc"
