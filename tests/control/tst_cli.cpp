// The headless host as scripts and acceptance checks use it: a real process
// with a private settings file.
#include "support/dbrows.h"
#include "support/erpfixture.h"

#include "localdb/database.h"
#include "localdb/schema.h"

#include <QDir>
#include <QFile>
#include <QProcess>
#include <QSettings>
#include <QStringDecoder>
#include <QTemporaryDir>
#include <QtTest>

#include <csignal>
#include <sys/types.h>

namespace {
struct Run {
    int exitCode = -1;
    QStringList out;
    QStringList err;
};

// The process inherits the ODBC sandbox, so a demo company registers its data source there.
QProcessEnvironment cliEnvironment(const QString& settings)
{
    QProcessEnvironment env = QProcessEnvironment::systemEnvironment();
    // Keep the user's own folders out of reach.
    const QString home = QFileInfo(settings).absolutePath();
    env.insert("HOME", home);
    env.insert("XDG_CONFIG_HOME", home + "/config");
    env.insert("XDG_DATA_HOME", home + "/data");
    env.remove("TAGORA_SETTINGS");
    // The job folder of pages and pictures, private to the test too.
    env.insert("Temp", home + "/temp");
    return env;
}

Run runCli(const QString& settings, const QStringList& args, const QByteArray& input = {})
{
    QProcess p;
    p.setProcessEnvironment(cliEnvironment(settings));
    p.start(qEnvironmentVariable("TAGORA_CLI"), QStringList{"--settings", settings} + args);
    if (!input.isEmpty())
        p.write(input);
    p.closeWriteChannel();
    p.waitForFinished(60000);
    return {p.exitStatus() == QProcess::NormalExit ? p.exitCode() : -1,
            QString::fromUtf8(p.readAllStandardOutput()).split('\n', Qt::SkipEmptyParts),
            QString::fromUtf8(p.readAllStandardError()).split('\n', Qt::SkipEmptyParts)};
}

QByteArray readAll(const QString& path)
{
    QFile f(path);
    return f.open(QIODevice::ReadOnly) ? f.readAll() : QByteArray();
}
} // namespace

using namespace tagora;

class TestCli : public QObject {
    Q_OBJECT
    QTemporaryDir dir;
    OdbcSandbox odbc;
    QString settings() const { return dir.filePath("cli.ini"); }
    void writeSettings(const QString& text) const
    {
        QFile f(settings());
        QVERIFY(f.open(QIODevice::WriteOnly) && f.write(text.toUtf8()) > 0);
    }

private slots:
    void init() { QFile::remove(settings()); }

    void verbs_data()
    {
        QTest::addColumn<QStringList>("args");
        QTest::addColumn<QStringList>("out");
        QTest::newRow("option") << QStringList{"set", "OptOLE(3)", "True", "get", "OptOLE(0)", "call", "GetOLEOption"}
                                << QStringList{"False", "6"};
        QTest::newRow("list by position") << QStringList{"set", "cmbQtyFrom", "3", "get", "cmbQtyFrom"}
                                          << QStringList{"3"};
        QTest::newRow("property suffix") << QStringList{"get", "cmbQtyFrom.ListCount", "get", "LblFldName(11).Tag",
                                                        "get", "cmbQtyFrom.Text"}
                                         << QStringList{"5", "2", QString::fromUtf8("הכמות בשורה כפול:")};
        QTest::newRow("clickable caption") << QStringList{"click", "lblVarNum(3)", "click", "lblVarNum(3)", "get",
                                                          "lblVarNum(3)"}
                                           << QStringList{"2"};
        QTest::newRow("change mirrors") << QStringList{"set", "txtFromDocNum", "77", "get", "txtToDocNum"}
                                        << QStringList{"77"};
        QTest::newRow("file dialog") << QStringList{"--file", "/labels/a b.lbl", "click", "CmdDir(1)", "get",
                                                    "txtLabelName"}
                                     << QStringList{"/labels/a b.lbl"};
        // No ERP, so no user chosen: the list of user 1 is the one read.
        QTest::newRow("method with result") << QStringList{"call", "GetUserNum", "call", "ClearMessage", "get",
                                                           "Message1"}
                                            << QStringList{"1", ""};
        QTest::newRow("status line") << QStringList{"set", "txtDBPath", "/nonexistent", "click", "cmdUpgrade"}
                                     << QStringList{QString::fromUtf8("השדרוג נכשל")};
    }
    void verbs()
    {
        QFETCH(QStringList, args);
        QFETCH(QStringList, out);
        const Run r = runCli(settings(), args);
        // Standard error holds only what the show step reports (no ERP here).
        QCOMPARE(r.err.filter("tagora-cli:"), QStringList());
        QCOMPARE(r.exitCode, 0);
        // An empty expected line stands for a value printed as an empty line.
        QStringList expected = out;
        expected.removeAll(QString());
        QCOMPARE(r.out, expected);
    }

    // What a run saves, the next run reads.
    void savePersists()
    {
        const QStringList save{"additem", "cmbPriceField", "Base", "set", "txtFromItem", "A'17", "click", "cmdSaveDef4"};
        QCOMPARE(runCli(settings(), save).exitCode, 0);
        QCOMPARE(runCli(settings(), {"get", "txtFromItem"}).out, QStringList{"A'17"});
        QVERIFY(QSettings(settings(), QSettings::IniFormat).contains("LabelByItems/FromItem"));
    }

    void criticalMessageSetsExitStatus()
    {
        // An items database that is not a database: the upgrade must fail loudly.
        QDir(dir.path()).mkpath("data1");
        QFile bad(dir.filePath("data1/tgrmitm.tdb"));
        QVERIFY(bad.open(QIODevice::WriteOnly) && bad.write("not a database") > 0);
        bad.close();
        const Run r = runCli(settings(), {"set", "txtDBPath", dir.filePath("data1"), "click", "cmdUpgrade"});
        QCOMPARE(r.exitCode, 1);
        QVERIFY(!r.err.isEmpty());
        QVERIFY(r.err.last().startsWith(QString::fromUtf8("תקלה: ")));
        QCOMPARE(r.out, QStringList{QString::fromUtf8("השדרוג נכשל")});
    }

    void mistakes_data()
    {
        QTest::addColumn<QStringList>("args");
        QTest::newRow("unknown control") << QStringList{"get", "txtNoSuch"};
        QTest::newRow("unknown verb") << QStringList{"frobnicate"};
        QTest::newRow("refused value") << QStringList{"set", "cmbQtyFrom", "9"};
        QTest::newRow("unknown method") << QStringList{"call", "NoSuchMethod"};
        QTest::newRow("bad argument") << QStringList{"call", "BuildItemQuery", "x", "1"};
        QTest::newRow("missing value") << QStringList{"set", "txtCopies"};
        QTest::newRow("not clickable") << QStringList{"click", "txtCopies"};
    }
    void mistakes()
    {
        QFETCH(QStringList, args);
        const Run r = runCli(settings(), args);
        QCOMPARE(r.exitCode, 2);
        QVERIFY(!r.err.filter("tagora-cli: ").isEmpty());
    }

    // A copies value the item selection refuses is a mistake in the command
    // line: said on standard error, exit status 2, the item keeps its copies.
    void refusedCellValue()
    {
        const QString data = dir.filePath("cells");
        QVERIFY(!PrepareDataFolder(data));
        QVERIFY(!execOn(data + "/" + dbfiles::Items,
                        "DELETE FROM tItems; INSERT INTO tItems (ItemKey, ItemName, Copies, PrintLabel) VALUES ('A1', 'x', 1, 1)"));
        const QStringList open{"set", "txtDBPath", data, "click", "cmdSelectItems"};
        const Run r = runCli(settings(), open + QStringList{"setcell", "VSSelectItems", "1", "3", "abc"});
        QCOMPARE(r.exitCode, 2);
        QCOMPARE(r.err.filter("tagora-cli: ").size(), 1);
        QCOMPARE(runCli(settings(), open + QStringList{"getcell", "VSSelectItems", "1", "3"}).out.last(), QString("1"));
    }

    // The document road's dialogs, scripted: types ticked, ranges reset,
    // a document's lines cleared and copies typed, each stored in its file.
    void scriptedDocumentDialogs()
    {
        const QString data = dir.filePath("docdialogs");
        QVERIFY(!PrepareDataFolder(data));
        const QString docs = data + "/" + dbfiles::TempDocs;
        DbError e;
        QVERIFY(!CreateTempDocsDB(data + "/" + dbfiles::Config, data + "/" + dbfiles::Items, docs, &e).isEmpty());
        QVERIFY(!execOn(docs, "INSERT INTO tTempDocHeaders (WizFileID, Number, DocType, Reference1, DocDate, Include) VALUES"
                              " (2, 7, 1, 'SO7', '2026-02-03T00:00:00', 1), (2, 8, 1, 'SO8', '2026-02-04', 1);"
                              "INSERT INTO tTempDocLines (WizFileID, HeadNumber, LineNum, ItemKey, Copies, Include) VALUES"
                              " (2, 7, 1, 'A', 1, 1), (2, 8, 1, 'B', 1, 1), (2, 8, 2, 'C', 1, 1)"));
        QVERIFY(!execOn(data + "/" + dbfiles::Config, "UPDATE tWizFileRanges SET FromIndx = 50, LastIndx = 49"));
        const QByteArray script = "click CmdDocType\n"
                                  "  setcell VSDocTypes 2 2 1\n"
                                  "  getcell VSDocTypes 2 1\n"
                                  "  click cmdClose\n"
                                  "click cmdRanges\n"
                                  "  click cmdNoneItems\n"
                                  "  getcell VSEditRange 1 3\n"
                                  "  click cmdClose\n"
                                  "click cmdSelectDocItems\n"
                                  "  getcell VSDocHeaders 2 3\n"
                                  "  setcell VSDocHeaders 2 1 x\n";
        Run r = runCli(settings(), {"set", "txtDBPath", data, "--script", "-"}, script);
        // A cell that is not typed in is refused as a mistake of the script.
        QCOMPARE(r.exitCode, 2);
        QCOMPARE(r.out, QStringList({QString::fromUtf8("הזמנות רכש"), "0", "04/02/26"}));
        QCOMPARE(rows(data + "/" + dbfiles::Config, "SELECT DocType FROM tDocTypes WHERE Include = 1 ORDER BY 1"),
                 QStringList({"1", "2", "3"}));
        QCOMPARE(rows(data + "/" + dbfiles::Config, "SELECT DISTINCT LastIndx || '/' || FromIndx FROM tWizFileRanges"),
                 QStringList{"49/0"});
        // Typing into the second document's print box moves to it, so the lines are its own.
        const QByteArray lines = "click cmdSelectDocItems\n"
                                 "  setcell VSDocHeaders 2 5 0\n"
                                 "  setcell VSDocLines 1 6 5\n"
                                 "  click cmdNoneLines\n"
                                 "  click cmdClose\n";
        r = runCli(settings(), {"set", "txtDBPath", data, "--script", "-"}, lines);
        QVERIFY2(r.exitCode == 0, qPrintable(r.err.join('\n')));
        QCOMPARE(rows(docs, "SELECT ItemKey || ':' || Copies || ':' || Include FROM tTempDocLines ORDER BY ItemKey"),
                 QStringList({"A:1:1", "B:5:0", "C:1:0"}));
        QCOMPARE(rows(docs, "SELECT Number || ':' || Include FROM tTempDocHeaders ORDER BY Number"), QStringList({"7:1", "8:0"}));
    }

    void scriptFromStandardInput()
    {
        const QByteArray script = "# a selection script\n"
                                  "set \"OptOLE(4)\" True\n"
                                  "set txtCompanyName 'Acme \"North\" Ltd'\n"
                                  "get txtCompanyName\n"
                                  "call GetOLEOption\n"
                                  "call SetGetRegParams 1 9   # an unknown action does nothing\n";
        const Run r = runCli(settings(), {"--script", "-"}, script);
        QCOMPARE(r.exitCode, 0);
        QCOMPARE(r.out, QStringList({"Acme \"North\" Ltd", "7"}));
    }

    // The road by documents, scripted: import the documents with their
    // items, keep one document, set one line's copies, clear another line,
    // print with header labels: a header label, then exactly the document's
    // included lines with their copies.
    void scriptedDocumentsPrint()
    {
        const QString journal = dir.filePath("docs-journal.txt");
        const QString demo = dir.filePath("demo-docs");
        writeSettings(QStringLiteral("[Automation]\nJournalFile=%1\n").arg(journal));
        const QByteArray script = "set txtToDate 31/12/2030\n"
                                  "set \"ChkFldSend(0)\" 1\n"
                                  "set chkPrintHeadLabel 1\n"
                                  "set chkReadDocItems 1\n"
                                  "click cmdImportDocs\n"
                                  "  click cmdNoneHeaders\n"
                                  "  setcell VSDocHeaders 1 5 1\n"
                                  "  setcell VSDocLines 2 6 3\n"
                                  "  setcell VSDocLines 3 7 0\n"
                                  "  click cmdClose\n"
                                  "click cmdPrintDocButt\n";
        const Run r = runCli(settings(), {"--demo", demo, "--script", "-"}, script);
        QVERIFY2(r.exitCode == 0, qPrintable(r.err.join('\n')));
        QCOMPARE(r.out.last(), QString::fromUtf8("הכנת המדבקות הסתיימה"));

        const QString docs = demo + "/data/" + dbfiles::TempDocs;
        QCOMPARE(scalar(docs, "SELECT count(*) FROM tTempDocHeaders WHERE Include").toInt(), 1);
        const QStringList lines = rows(docs, "SELECT l.ItemKey, l.Copies, l.LineNum, l.Include FROM tTempDocLines l"
                                             " JOIN tTempDocHeaders h ON h.WizFileID = l.WizFileID AND h.Number = l.HeadNumber"
                                             " WHERE h.Include ORDER BY l.LineNum");
        QVERIFY(lines.size() >= 3);
        QVERIFY2(lines[1].section('|', 1, 1) == "3", qPrintable(lines.join(' ')));
        QCOMPARE(lines[2].section('|', 3, 3), QString("0"));
        // Lines print when their item is in the items table (a service item is not).
        QStringList expected = rows(docs, "SELECT l.ItemKey || ' ' || l.Copies FROM tTempDocLines l"
                                          " JOIN tTempDocHeaders h ON h.WizFileID = l.WizFileID AND h.Number = l.HeadNumber"
                                          " WHERE h.Include AND l.Include AND l.ItemKey IN (SELECT ItemKey FROM tItems)");
        QStringList printed;
        QString key;
        for (const QString& line : QString::fromUtf8(readAll(journal)).split('\n')) {
            if (line.contains("LabelSetVar("))
                key = line.section('"', 3, 3);
            else if (line.contains("LabelPrint("))
                printed << key + " " + line.section('"', 1, 1).section(',', 0, 0);
        }
        QVERIFY(!printed.isEmpty());
        // The header label comes first, one copy.
        QVERIFY2(printed.takeFirst().endsWith(" 1"), qPrintable(printed.join(' ')));
        printed.sort();
        expected.sort();
        QCOMPARE(printed, expected);
    }

    // The ERP's label list, scripted: every line of the user's list prints,
    // in the list's order (a roll printer takes it last to first), with the
    // file of its definition (the default one where that file is not here),
    // its parameters in the label variables their numbers name, and its quantity.
    void scriptedLabelListPrints()
    {
        const QString journal = dir.filePath("plate-journal.txt");
        const QString demo = dir.filePath("demo-plate");
        writeSettings(QStringLiteral("[Automation]\nJournalFile=%1\n").arg(journal));
        // The stored position picks the first user, number 1.
        Run r = runCli(settings(), {"--demo", demo, "call", "GetUserNum", "get", "cmbUser.Text"});
        QVERIFY2(r.exitCode == 0, qPrintable(r.err.join('\n')));
        QCOMPARE(r.out.mid(r.out.size() - 2), QStringList({"1", "admin"}));
        const QString erp = demo + "/erp/demo.sqlite";
        const QString own = demo + "/shelf.lbl";
        QFile f(own);
        QVERIFY(f.open(QIODevice::WriteOnly) && f.write("x") == 1);
        f.close();
        QVERIFY(!execOn(erp, QStringLiteral("UPDATE LABELSDEF SET LABELPATH = '%1' WHERE LABELDEF = 1").arg(own)));

        const QByteArray script = "set \"ChkFldSend(0)\" 1\n"
                                  "click \"lblVarNum(0)\"\n"
                                  "set \"ChkFldSend(1)\" 1\n"
                                  "click \"lblVarNum(1)\"\n"
                                  "click \"lblVarNum(1)\"\n"
                                  "set \"ChkFldSend(2)\" 1\n"
                                  "set txtLabelName /labels/default.lbl\n"
                                  "click cmdLabByPlate\n";
        r = runCli(settings(), {"--script", "-"}, script);
        QVERIFY2(r.exitCode == 0, qPrintable((r.out + r.err).join('\n')));
        QCOMPARE(r.out.last(), QString::fromUtf8("סריקת המשטח והדפסת המדבקות הסתיימה"));

        // The parameters as the label shows them: a text in cell form, cell
        // by cell; any other as it stands.
        auto shown = [](const QString& cells) {
            if (!cells.contains(QChar(0x05F0)))
                return cells;
            QString out;
            static const QString pairs = "()<>[]{}";
            for (QChar c : cells) {
                if (c == QChar(0x05F0))
                    continue;
                const int i = pairs.indexOf(c);
                out += i < 0 ? c : pairs[i ^ 1];
            }
            return out;
        };
        QStringList expected;
        for (const QString& line : rows(erp, "SELECT LABELDEF, PAR1, PAR2, LABELQUANT FROM LABELS WHERE USER = 1"
                                             " ORDER BY Sort DESC, KLINE DESC")) {
            const QStringList v = line.split('|');
            expected << QStringList{v[0] == "1" ? own : "/labels/default.lbl", v[1], v[2], v[3]}.join(" ; ");
        }
        QStringList printed;
        QString file;
        QStringList values;
        for (const QString& line : QString::fromUtf8(readAll(journal)).split('\n')) {
            if (line.contains("LabelOpen(")) {
                file = line.section('"', 1, 1);
            } else if (line.contains("LabelSetVar(")) {
                const int start = line.indexOf('"', line.indexOf('"', line.indexOf('"', line.indexOf('"') + 1) + 1)) + 1;
                const QString quoted = line.mid(start, line.lastIndexOf("\", -9999") - start);
                // The journal writes a quote or a backslash after a backslash.
                QString value;
                for (qsizetype i = 0; i < quoted.size(); ++i)
                    value += quoted[i] == '\\' && i + 1 < quoted.size() ? quoted[++i] : quoted[i];
                values << shown(value);
            } else if (line.contains("LabelPrint(")) {
                printed << (QStringList{file} + values + QStringList{line.section('"', 1, 1).section(',', 0, 0)}).join(" ; ");
                values.clear();
            }
        }
        QCOMPARE(printed.size(), 8);
        QVERIFY(!expected.filter(own).isEmpty());
        QCOMPARE(printed, expected);

        // A user with an empty list: the run reads nothing and says so.
        r = runCli(settings(), {"set", "cmbUser", "2", "call", "GetUserNum", "click", "cmdLabByPlate"});
        QCOMPARE(r.exitCode, 1);
        QCOMPARE(r.out.first(), QString("3"));
        QVERIFY2(r.err.last().endsWith(QString::fromUtf8("לא נבחרו פריטים להדפסה")), qPrintable(r.err.join('\n')));
    }

    // A label list on the direct page: each layout line shows the parameter
    // its field's row names; a barcode line whose row names none has no
    // column to draw from, and the run says so instead of showing a page.
    void labelListDirectPage_data()
    {
        QTest::addColumn<bool>("barcodeNumbered");
        QTest::newRow("barcode from a parameter") << true;
        QTest::newRow("barcode without a parameter") << false;
    }
    void labelListDirectPage()
    {
        QFETCH(bool, barcodeNumbered);
        const QString demo = dir.filePath(barcodeNumbered ? "plate-direct1" : "plate-direct2");
        QByteArray script = "set \"OptOLE(3)\" True\n"
                            "click \"lblVarNum(1)\"\n"
                            "click \"lblVarNum(1)\"\n";
        // The demo layout: the name (row 1) on top, then the barcode (row 4).
        if (barcodeNumbered)
            script += "click \"lblVarNum(4)\"\nclick \"lblVarNum(4)\"\nclick \"lblVarNum(4)\"\n";
        script += "click cmdLabByPlate\n";
        const Run r = runCli(settings(), {"--demo", demo, "--script", "-"}, script);
        if (!barcodeNumbered) {
            QCOMPARE(r.exitCode, 1);
            QVERIFY2(r.err.last().contains("BarCode"), qPrintable(r.err.join('\n')));
            return;
        }
        QVERIFY2(r.exitCode == 0, qPrintable((r.out + r.err).join('\n')));
        const QStringList pages = r.out.filter(QRegularExpression("^page: "));
        QCOMPARE(pages.size(), 1);
        const QByteArray page = readAll(pages.first().mid(6));
        QStringDecoder decode("windows-1255");
        const QString text = decode(page);
        const QStringList lines = rows(demo + "/erp/demo.sqlite",
                                       "SELECT PAR2 || '|' || LABELQUANT || '|' || coalesce(PAR3, '') FROM LABELS"
                                       " WHERE USER = 1 AND LABELQUANT > 0");
        QVERIFY(!lines.isEmpty());
        int labels = 0;
        for (const QString& line : lines) {
            QVERIFY2(text.contains(line.section('|', 0, 0).toHtmlEscaped().replace('\'', "&#39;")),
                     qPrintable(line));
            // A line without a barcode value gets an empty cell, not a picture.
            if (!line.section('|', 2).isEmpty())
                labels += line.section('|', 1, 1).toInt();
        }
        QCOMPARE(int(page.count("<img src=")), labels);
    }

    // The list buttons: the page of the records a print would produce, in
    // the job folder, its path printed as the page the browser would show.
    void itemListPage_data()
    {
        QTest::addColumn<bool>("listed");
        QTest::newRow("items tab") << true;
        QTest::newRow("nothing marked") << false;
    }
    void itemListPage()
    {
        QFETCH(bool, listed);
        const QString demo = dir.filePath(listed ? "list-demo1" : "list-demo2");
        Run r = runCli(settings(), {"--demo", demo, "--script", "-"}, "set cmbPriceField 1\nclick CmdImportItems\n");
        QVERIFY2(r.exitCode == 0, qPrintable(r.err.join('\n')));
        if (listed)
            QVERIFY(!execOn(demo + "/data/" + dbfiles::Items, "UPDATE tItems SET PrintLabel = 1, Copies = 2"));
        r = runCli(settings(), {"--demo", demo, "--script", "-"}, "set \"ChkFldSend(0)\" 1\nclick \"cmdPreview(1)\"\n");
        QVERIFY2(r.exitCode == 0, qPrintable((r.out + r.err).join('\n')));
        const QString page = QFileInfo(settings()).absolutePath() + "/temp/tgrlab/tgrlab2.htm";
        QCOMPARE(r.out.filter(QRegularExpression("^page: ")), QStringList{"page: " + page});
        const QString text = QStringDecoder("windows-1255").decode(readAll(page));
        QVERIFY(text.startsWith("<HTML>\r\n"));
        const int items = scalar(demo + "/data/" + dbfiles::Items, "SELECT count(*) FROM tItems").toInt();
        QVERIFY(items > 0);
        // A row per item, its copies last; the heading row holds the captions.
        QCOMPARE(int(text.count("  <td>2</td>\r\n </tr>")), listed ? items : 0);
        QCOMPARE(text.endsWith("</HTML>\r\n"), listed);
    }

    // The whole road by items, scripted: import, select (find, mark, copies), print.
    void scriptedSelectionPrints()
    {
        const QString journal = dir.filePath("journal.txt");
        writeSettings(QStringLiteral("[Automation]\nJournalFile=%1\n").arg(journal));
        const QByteArray script = "set cmbPriceField 1\n"
                                  "click CmdImportItems\n"
                                  "set \"ChkFldSend(0)\" 1\n"
                                  "click cmdSelectItems\n"
                                  "  set txtToItemkey \"O'R-5\"\n"
                                  "  click cmdFindKey\n"
                                  "  set txtToItemkey \"AB'12\"\n"
                                  "  click cmdFindKey\n"
                                  "  set txtAllCopis 3\n"
                                  "  click CmdAllCopies\n"
                                  "  click cmdShowMarked\n"
                                  "  getcell VSSelectItems 1 1\n"
                                  "  setcell VSSelectItems 1 3 5\n"
                                  "  click cmdClose\n"
                                  "click cmdPrintItmes\n";
        const Run r = runCli(settings(), {"--demo", dir.filePath("demo2"), "--script", "-"}, script);
        QVERIFY2(r.exitCode == 0, qPrintable(r.err.join('\n')));
        QVERIFY(r.out.contains("AB'12"));
        QCOMPARE(r.out.last(), QString::fromUtf8("הכנת המדבקות הסתיימה"));
        QStringList sent;
        for (const QString& line : QString::fromUtf8(readAll(journal)).split('\n'))
            if (line.contains("LabelSetVar(") || line.contains("LabelPrint("))
                sent << line.section('(', 1).section(')', 0, 0);
        // A roll printer: last key first, each with its copies.
        QCOMPARE(sent, QStringList({"2, \"ItemKey\", \"O'R-5\", -9999, -9999", "2, \"3,0\"",
                                    "2, \"ItemKey\", \"AB'12\", -9999, -9999", "2, \"5,0\""}));
    }

    // "Overwrite the previous scan" replaces the items in one transaction: a
    // process killed while it reads the new ones leaves the old items with
    // their marks, and the next import runs as if nothing had happened.
    void killedCleanImportKeepsItems()
    {
        const QString demo = dir.filePath("killed");
        const QStringList import{"set", "cmbPriceField", "1", "set", "ChkClean", "1", "click", "CmdImportItems"};
        Run r = runCli(settings(), QStringList{"--demo-items", "20000", "--demo", demo} + import);
        QVERIFY2(r.exitCode == 0, qPrintable(r.err.join('\n')));
        const QString items = demo + "/data/" + dbfiles::Items;
        QVERIFY(!execOn(items, "UPDATE tItems SET PrintLabel = TRUE, Copies = 7 WHERE rowid % 3 = 0"));
        const QString kept = "SELECT ItemKey, PrintLabel, Copies FROM tItems ORDER BY 1 COLLATE BINARY";
        const QStringList before = rows(items, kept);
        QVERIFY(before.size() > 1000);

        // Killed once the item reader has begun writing: its status line is
        // out and the items file has a journal, which exists only while a
        // write transaction is open.
        QProcess p;
        p.setProcessEnvironment(cliEnvironment(settings()));
        p.start(qEnvironmentVariable("TAGORA_CLI"), QStringList{"--settings", settings()} + import);
        const QString journal = items + "-journal";
        // "קורא פריטים..." from the command, then the reader's own "קורא פריטים".
        const QString reading = QString::fromUtf8("קורא פריטים");
        QString out;
        bool inReader = false;
        while (p.state() != QProcess::NotRunning && !(inReader && QFile::exists(journal))) {
            p.waitForReadyRead(5);
            out += QString::fromUtf8(p.readAllStandardOutput());
            const QStringList lines = out.split('\n', Qt::SkipEmptyParts);
            inReader = !lines.isEmpty() && lines.last().startsWith(reading);
        }
        QVERIFY2(p.state() != QProcess::NotRunning, "the import ended before it could be killed");
        ::kill(pid_t(p.processId()), SIGKILL);
        p.waitForFinished();
        QCOMPARE(p.exitStatus(), QProcess::CrashExit);
        QVERIFY(QFile::exists(journal));

        QCOMPARE(rows(items, kept), before);
        r = runCli(settings(), import);
        QVERIFY2(r.exitCode == 0, qPrintable(r.err.join('\n')));
        QCOMPARE(r.out.last(), QString::fromUtf8("הייבוא הסתיים בהצלחה"));
        QCOMPARE(rows(items, "SELECT count(*), sum(PrintLabel IS TRUE), sum(Copies = 7) FROM tItems"),
                 QStringList{QString("%1|0|0").arg(before.size())});
    }

    // A print killed (kill -9) while it creates the documents database: the
    // file being built lies aside, so the next run finds no half file under
    // the name, removes the leftover, builds the file whole and prints.
    void killedCreationIsRebuilt()
    {
        const QString data = dir.filePath("killedcreation");
        QVERIFY(!PrepareDataFolder(data));
        QVERIFY(!execOn(data + "/" + dbfiles::Items,
                        "INSERT INTO tItems (ItemKey, ItemName, Copies, PrintLabel) VALUES ('K1', 'Bolt', 2, TRUE)"));
        const QString journal = dir.filePath("killed-journal.txt");
        writeSettings(QStringLiteral("[Automation]\nJournalFile=%1\n[GeneralParams]\nDBPath=%2\n[LabelVars]\n00FldSend=1\n")
                          .arg(journal, data));
        // The configuration held locked stops the creation at its first link,
        // after its tables: there the process is killed.
        Database config;
        QVERIFY(!config.open(data + "/" + dbfiles::Config));
        QVERIFY(!config.exec("BEGIN EXCLUSIVE"));
        QProcess cli;
        cli.setProcessEnvironment(cliEnvironment(settings()));
        cli.start(qEnvironmentVariable("TAGORA_CLI"), {"--settings", settings(), "click", "cmdPrintItmes"});
        QVERIFY(cli.waitForStarted());
        auto tablesMade = [&] {
            for (const QString& name : QDir(data).entryList({dbfiles::TempDocs + "*"}, QDir::Files)) {
                if (name.endsWith("-journal"))
                    continue;
                Database made;
                if (!made.open(data + "/" + name, Database::OpenMode::ReadOnly) && made.tableNames().size() >= 7)
                    return true;
            }
            return false;
        };
        QTRY_VERIFY_WITH_TIMEOUT(tablesMade() || cli.state() == QProcess::NotRunning, 30000);
        QCOMPARE(cli.state(), QProcess::Running);
        cli.kill();
        QVERIFY(cli.waitForFinished());
        QVERIFY(!config.exec("ROLLBACK"));
        config.close();
        QVERIFY(!QFile::exists(data + "/" + dbfiles::TempDocs));
        const QStringList left = QDir(data).entryList({dbfiles::TempDocs + ".building-*"}, QDir::Files);
        QCOMPARE(left.filter(QRegularExpression("-[0-9]+$")).size(), 1);

        const Run r = runCli(settings(), {"click", "cmdPrintItmes"});
        QVERIFY2(r.exitCode == 0, qPrintable((r.out + r.err).join('\n')));
        QCOMPARE(r.out.last(), QString::fromUtf8("הכנת המדבקות הסתיימה"));
        QVERIFY(QDir(data).entryList({"*.building-*"}, QDir::Files).isEmpty());
        QVERIFY(MissingObjects(data + "/" + dbfiles::TempDocs).isEmpty());
        QVERIFY(readAll(journal).contains("LabelSetVar(2, \"ItemKey\", \"K1\""));
    }

    // The local item card, from a host's call and from a click in the item
    // selection's card column: the waiting page, then the card in its window.
    void localItemCard_data()
    {
        QTest::addColumn<QStringList>("script");
        QTest::newRow("call-info") << QStringList{"call-info", "OpenItemHTML", "it'S-1", "%docs"};
        QTest::newRow("card column") << QStringList{"set",       "txtDBPath",     "%data", "click", "cmdSelectItems",
                                                    "set",       "OptItmCard(1)", "True",  "clickcell",
                                                    "VSSelectItems", "1",         "0",     "click", "cmdClose"};
    }
    void localItemCard()
    {
        QFETCH(QStringList, script);
        const QString data = dir.filePath("localcard");
        if (!QFile::exists(data + "/" + dbfiles::TempDocs)) {
            QVERIFY(!PrepareDataFolder(data));
            DbError e;
            QVERIFY(!CreateTempDocsDB(data + "/" + dbfiles::Config, data + "/" + dbfiles::Items,
                                      data + "/" + dbfiles::TempDocs, &e).isEmpty());
            QVERIFY(!execOn(data + "/" + dbfiles::Items,
                            "DELETE FROM tItems; INSERT INTO tItems (ItemKey, ItemName, Copies, PrintLabel)"
                            " VALUES ('IT''S-1', 'Card <item>', 1, 1)"));
        }
        script.replaceInStrings("%docs", data + "/" + dbfiles::TempDocs);
        script.replaceInStrings("%data", data);
        const QString temp = QFileInfo(settings()).absolutePath() + "/temp/";
        QFile::remove(temp + "vnicrd2.htm");
        const Run r = runCli(settings(), script);
        QVERIFY2(r.exitCode == 0, qPrintable((r.out + r.err).join('\n')));
        QCOMPARE(r.out.filter(QRegularExpression("^page: ")),
                 QStringList({"page: " + temp + "vnicrd0.htm", "page: " + temp + "vnicrd2.htm"}));
        const QString card = QStringDecoder("windows-1255").decode(readAll(temp + "vnicrd2.htm"));
        QVERIFY2(card.contains("<b>IT&#39;S-1</b>") && card.contains("Card &lt;item&gt;"), qPrintable(card));
    }

    // A method with an optional last parameter stops taking arguments at the next verb.
    void optionalArgumentsStopAtVerb()
    {
        const Run r = runCli(settings(), {"call", "RunOLE", "x.lbl", "1", "1", "5", "/tmp/none.tmp", "false", "get",
                                          "txtCopies"});
        // The run fails on the missing database (a critical box, result 0); the next verb still runs.
        QCOMPARE(r.exitCode, 1);
        QCOMPARE(r.out.mid(r.out.size() - 2), QStringList({"0", "1"}));
    }
};

QTEST_MAIN(TestCli)
#include "tst_cli.moc"
