// The local item card: what it finds for awkward keys, which sections it
// shows, what it escapes, what a failure leaves, and how a browser lays it out.
#include "support/labeldata.h"
#include "support/recordingviewer.h"

#include "cards/cardpage.h"
#include "cards/tagorainfo.h"
#include "platform/prompt.h"

#include <QDir>
#include <QFile>
#include <QProcess>
#include <QRegularExpression>
#include <QStandardPaths>
#include <QStringDecoder>
#include <QTemporaryDir>
#include <QUrl>
#include <QtTest>

using namespace tagora;

namespace {
const QString kTitleEnd = QStringLiteral("כרטיס פריט - תגורה של ונמר</td></tr>\r\n");

QString readPage(const QString& path)
{
    QFile f(path);
    return f.open(QIODevice::ReadOnly) ? QStringDecoder("windows-1255").decode(f.readAll()) : QString();
}
} // namespace

class TestTagoraInfo : public QObject {
    Q_OBJECT
    QTemporaryDir work;
    std::unique_ptr<LabelData> data;
    std::shared_ptr<ScriptedPrompt> prompt;
    std::shared_ptr<RecordingViewer> pages;

    QString cardPath() const { return CardPagePath(cardfiles::LocalCard); }
    QString waitPath() const { return CardPagePath(cardfiles::Wait); }

private slots:
    void initTestCase()
    {
        qputenv("Temp", work.filePath(QStringLiteral("temp")).toUtf8());
        data = std::make_unique<LabelData>(QStringLiteral(
            "INSERT INTO tItems (ItemKey, ItemName, BarCode, Fname, Weight) VALUES"
            " ('O''Neil', 'Apostrophe', NULL, NULL, NULL), ('Q\"1', 'Quote', NULL, NULL, NULL),"
            " ('מפתח', 'שלום', NULL, 'Shalom', 0.5), ('<b>&1', 'Nut & <Bolt>', '<x>', 'A&B', NULL),"
            " ('MiX-1', 'Mixed', NULL, NULL, NULL);"
            "INSERT INTO tPLName VALUES (3, 'Retail <A&B>');"
            "INSERT INTO tAlterPrices VALUES ('Zed', 'A1', 12345.5, NULL);"
            "UPDATE tAccountDef SET LabelName = 'main.lbl', Label2Name = 'second <2>.lbl';"));
    }
    void cleanupTestCase() { qunsetenv("Temp"); }
    void init()
    {
        prompt = std::make_shared<ScriptedPrompt>(nullptr);
        pages = std::make_shared<RecordingViewer>();
        QFile::remove(cardPath());
    }

    // Keys are bound, so any character finds its item or nothing; a key not
    // there gives the card that ends after its title row.
    void card_data()
    {
        QTest::addColumn<QString>("code");
        QTest::addColumn<QString>("account");
        QTest::addColumn<QStringList>("present");
        QTest::addColumn<QStringList>("absent");
        const QString empty = kTitleEnd + QStringLiteral("</table>"), defs = QStringLiteral("הגדרות לקוח/ספק");
        QTest::newRow("apostrophe") << "O'Neil" << "" << QStringList{"<b>O&#39;Neil</b>"} << QStringList{empty};
        QTest::newRow("hebrew") << "מפתח" << "" << QStringList{"<b>מפתח</b>", "<td>שלום</td>", "<td>0.5</td>"} << QStringList{};
        QTest::newRow("markup") << "<b>&1" << ""
                                << QStringList{"<b>&lt;b&gt;&amp;1</b>", "<td>Nut &amp; &lt;Bolt&gt;</td>", "<td>A&amp;B</td>"}
                                << QStringList{"<Bolt>"};
        QTest::newRow("mixed case") << "mix-1" << "" << QStringList{"<b>MiX-1</b>"} << QStringList{empty};
        QTest::newRow("none: quoted condition") << "A1' OR '1'='1" << "" << QStringList{empty} << QStringList{"<b>"};
        // The item's sections, in order; empty cells keep their borders.
        QTest::newRow("sections") << "A1" << ""
                                  << QStringList{"Retail &lt;A&amp;B&gt;", "O&#39;Brien", "12,345.50", "OBBAR1"}
                                  << QStringList{defs};
        QTest::newRow("no sections") << "B1" << "" << QStringList{"<td>&nbsp;</td>"}
                                     << QStringList{"מחירונים", "מחירים מיוחדים", "מפתחות חליפיים"};
        QTest::newRow("account") << "A1" << "o'brien"
                                 << QStringList{defs, "<td>main.lbl</td>", "<td dir=ltr>second &lt;2&gt;.lbl</td>"}
                                 << QStringList{};
        QTest::newRow("account without definitions") << "A1" << "Nobody" << QStringList{"OB-A1"} << QStringList{defs};
    }
    void card()
    {
        QFETCH(QString, code);
        QFETCH(QString, account);
        QFETCH(QStringList, present);
        QFETCH(QStringList, absent);
        QVERIFY(TagoraInfo(pages, prompt).CreateItemHTML(cardPath(), code, data->docs, account));
        QVERIFY2(prompt->lines().isEmpty(), qPrintable(prompt->lines().join('\n')));
        const QString text = readPage(cardPath());
        QVERIFY(text.endsWith(QStringLiteral("</HTML>\r\n")));
        for (const QString& p : present)
            QVERIFY2(text.contains(p), qPrintable(p));
        for (const QString& a : absent)
            QVERIFY2(!text.contains(a), qPrintable(a));
    }

    // The card after the waiting page, in the same window; the code as typed,
    // spaces around it dropped.
    void opensAfterWaitPage()
    {
        TagoraInfo(pages, prompt).OpenItemHTML(QStringLiteral("  A1 "), data->docs);
        QCOMPARE(pages->shown, QStringList({waitPath(), cardPath()}));
        QVERIFY(readPage(cardPath()).contains(QStringLiteral("<b>A1</b>")));
        QVERIFY(prompt->lines().isEmpty());
    }

    // A card that cannot be made: the reason as a fault, no card (not even an
    // earlier one), and the window left on a waiting page that stops reloading.
    void failure_data()
    {
        QTest::addColumn<QString>("account");
        QTest::newRow("missing database") << "";
        QTest::newRow("failed query") << "O'Brien";
    }
    void failure()
    {
        QFETCH(QString, account);
        QString database = work.filePath(QStringLiteral("none/tgrrtdb.tmp"));
        LabelData broken; // for the failed query, an items file without the definitions table
        if (!account.isEmpty()) {
            database = broken.docs;
            Database db;
            QVERIFY(!db.open(broken.folder + "/" + dbfiles::Items) && !db.exec(QStringLiteral("DROP TABLE tAccountDef")));
        }
        QFile earlier(cardPath());
        QVERIFY(earlier.open(QIODevice::WriteOnly) && earlier.write("<HTML>earlier</HTML>") > 0);
        earlier.close();
        TagoraInfo(pages, prompt).OpenItemHTML(QStringLiteral("A1"), database, account);
        QCOMPARE(prompt->criticalCount(), 1);
        QCOMPARE(prompt->shown().front().title, titles::Fault);
        QVERIFY(!QFile::exists(cardPath()));
        QCOMPARE(pages->shown, QStringList{waitPath()});
        const QString wait = readPage(waitPath());
        QVERIFY(wait.contains(QStringLiteral("נא להמתין")) && !wait.contains(QLatin1String(kPageReloadMeta)));
        QVERIFY(!TagoraInfo(pages, prompt).CreateItemHTML(cardPath(), QStringLiteral("A1"), database, account));
    }

    // A browser shows the card right to left: read from the layout it computed,
    // not a screenshot (fonts vary); a misread code page loses the Hebrew word.
    void browserReadsRightToLeft()
    {
        const QString chromium = QStandardPaths::findExecutable(QStringLiteral("chromium"));
        if (chromium.isEmpty())
            QSKIP("chromium is not installed");
        QVERIFY(TagoraInfo(pages, prompt).CreateItemHTML(cardPath(), QStringLiteral("מפתח"), data->docs));
        QTemporaryDir probeDir;
        const QString probe = probeDir.filePath(QStringLiteral("card.htm"));
        QVERIFY(QFile::copy(cardPath(), probe));
        QFile p(probe);
        QVERIFY(p.open(QIODevice::Append));
        p.write("<script>onload = function () { var b = document.body, w = '\\u05e9\\u05dc\\u05d5\\u05dd', r = document.createRange();\n"
                "  b.dataset.direction = getComputedStyle(b).direction;\n"
                "  for (var c of document.querySelectorAll('td')) {\n"
                "    var t = c.firstChild, n = c.nextElementSibling;\n"
                "    if (t && t.data === w) { r.setStart(t, 0); r.setEnd(t, 1); var first = r.getBoundingClientRect();\n"
                "      r.setStart(t, w.length - 1); r.setEnd(t, w.length);\n"
                "      b.dataset.firstRight = first.left >= r.getBoundingClientRect().right; }\n"
                "    if (c.className === 'Cap' && n && !b.dataset.columns)\n"
                "      b.dataset.columns = c.getBoundingClientRect().left > n.getBoundingClientRect().left ? 'rtl' : 'ltr';\n"
                "  } };</script>\n");
        p.close();
        const QString dom = dumpDom(chromium, probe, probeDir.filePath(QStringLiteral("profile")));
        const QRegularExpressionMatch body = QRegularExpression(QStringLiteral("<body([^>]*)>")).match(dom);
        QVERIFY2(body.hasMatch(), qPrintable(dom.left(400)));
        QVERIFY2(body.captured(1).contains(QStringLiteral("data-direction=\"rtl\"")), qPrintable(body.captured(1)));
        QVERIFY2(body.captured(1).contains(QStringLiteral("data-first-right=\"true\"")), qPrintable(body.captured(1)));
        QVERIFY2(body.captured(1).contains(QStringLiteral("data-columns=\"rtl\"")), qPrintable(body.captured(1)));
    }

    // A desktop browser cannot be driven, so the waiting page moves its
    // window on itself: after navigate(), opening it lands on the page named,
    // even from a folder whose name needs escaping in an address.
    void waitPageMovesOn()
    {
        const QString chromium = QStandardPaths::findExecutable(QStringLiteral("chromium"));
        if (chromium.isEmpty())
            QSKIP("chromium is not installed");
        QTemporaryDir dir;
        const QString folder = dir.filePath(QStringLiteral("O'Brien #1 %20 תיקייה"));
        QVERIFY(QDir().mkpath(folder));
        const QString wait = folder + QStringLiteral("/wait.htm");
        const QString card = folder + QStringLiteral("/card.htm");
        QVERIFY(WriteCardWaitPage(wait, QStringLiteral("#287B00"), true).isEmpty());
        QFile target(card);
        QVERIFY(target.open(QIODevice::WriteOnly) && target.write("<html><body data-arrived=\"yes\"></body></html>"));
        target.close();
        QString error;
        QVERIFY2(DesktopPageViewer().navigate(wait, card, &error), qPrintable(error));
        const QString dom = dumpDom(chromium, wait, dir.filePath(QStringLiteral("profile")));
        QVERIFY2(dom.contains(QStringLiteral("data-arrived=\"yes\"")), qPrintable(dom.left(400)));
    }

private:
    static QString dumpDom(const QString& chromium, const QString& page, const QString& profile)
    {
        QProcess browser;
        browser.start(chromium, {"--headless", "--no-sandbox", "--disable-gpu", "--disable-quic", "--no-first-run",
                                 "--disable-background-networking", "--disable-component-update", "--disable-sync",
                                 "--user-data-dir=" + profile, "--virtual-time-budget=5000", "--dump-dom",
                                 QUrl::fromLocalFile(page).toString()});
        browser.waitForFinished(120000);
        return QString::fromUtf8(browser.readAllStandardOutput());
    }
};

QTEST_MAIN(TestTagoraInfo)
#include "tst_tagorainfo.moc"
