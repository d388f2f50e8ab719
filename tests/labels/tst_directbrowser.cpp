// The page of the demo company's labels as a browser shows it: rendered by
// headless Chromium, and every barcode on it read back by a barcode reader.
#include "support/cardfixture.h"
#include "support/dbrows.h"
#include "support/erpfixture.h"
#include "support/labeldata.h"

#include "erp/connparams.h"
#include "erp/itemimport.h"
#include "labels/directlayout.h"
#include "localdb/schema.h"
#include "platform/pageviewer.h"

#include <QProcess>
#include <QPushButton>
#include <QtTest>

using namespace tagora;

class TestDirectBrowser : public QObject {
    Q_OBJECT
    OdbcSandbox odbc;
    QTemporaryDir work;

private slots:
    void barcodesReadBackFromTheRenderedPage()
    {
        const QString chromium = QStandardPaths::findExecutable("chromium");
        const QString zbarimg = QStandardPaths::findExecutable("zbarimg");
        QVERIFY2(!chromium.isEmpty() && !zbarimg.isEmpty(), "chromium and zbarimg are installed by the setup");

        DemoOptions o;
        odbc.addDemo("TagoraPage", o);
        const QString data = work.filePath("data");
        QVERIFY(!PrepareDataFolder(data));
        ReadError e;
        const ErpReadContext ctx{BuildConnString("TagoraPage", "sa", QVariant(), "", 2)};
        QVERIFY(ReadItemPriority(ctx, data + "/" + dbfiles::Items, {}, {}, false, 1, 1, false, false, &e));
        DbError de;
        QVERIFY(!CreateTempDocsDB(data + "/" + dbfiles::Config, data + "/" + dbfiles::Items, data + "/" + dbfiles::TempDocs, &de).isEmpty());
        QVERIFY(!execOn(data + "/" + dbfiles::Items, "UPDATE tItems SET PrintLabel = 1, Copies = 1"));
        const QStringList expected = rows(data + "/" + dbfiles::Items,
                                          "SELECT 'CODE-128:' || BarCode FROM tItems WHERE BarCode <> '' ORDER BY 1");
        QVERIFY(expected.size() > 10);

        // One page tall enough for every label: a barcode, the name, the price.
        const QString temp = work.filePath("temp");
        qputenv("Temp", temp.toUtf8());
        CardFixture f(QStringLiteral("[GeneralParams]\nDBPath=%1\nOptOLE3=True\nOptOLE0=False\n"
                                     "[LabelDef0]\nUseCell=-1\nFldID=1\n"
                                     "[LabelDef1]\nUseCell=-1\nFldID=4\nViewType=1\n"
                                     "[LabelDef2]\nUseCell=-1\nFldID=6\nPrefix=מחיר:\n"
                                     "[LabelBar]\nBarType=2\nDimX=0.01\nBarHeight=0.3\nUserResoX=0\nUserResoY=0\nShowDesc=-1\n"
                                     "[DirectLabel]\nPageRows=20\nPageCols=3\n").arg(data).toUtf8());
        auto& viewer = f.pages;
        MainCard& card = *f.card;
        card.control<QPushButton>("cmdPrintItmes")->click();
        QVERIFY2(f.prompt->lines().isEmpty(), qPrintable(f.prompt->lines().join('\n')));
        QCOMPARE(viewer->shown.size(), 1);
        qunsetenv("Temp");
        directLabelLayout() = DirectLabelLayout{};

        const QString png = work.filePath("page.png");
        QProcess browser;
        browser.start(chromium, {"--headless", "--no-sandbox", "--disable-gpu", "--disable-quic", "--no-first-run",
                                 "--disable-background-networking", "--disable-component-update", "--disable-sync",
                                 "--hide-scrollbars", "--user-data-dir=" + work.filePath("profile"),
                                 "--window-size=1100,4200", "--screenshot=" + png,
                                 QUrl::fromLocalFile(viewer->shown.first()).toString()});
        QVERIFY(browser.waitForFinished(120000));
        QVERIFY2(QFile::exists(png), browser.readAllStandardError().right(800).constData());

        QProcess reader;
        reader.start(zbarimg, {"-q", png});
        QVERIFY(reader.waitForFinished(60000));
        QStringList decoded = QString::fromUtf8(reader.readAllStandardOutput()).split('\n', Qt::SkipEmptyParts);
        decoded.sort();
        QCOMPARE(decoded, expected);
    }

    // Labels whose barcode was refused or has no value: the browser, loading
    // the page as it stands, finds every picture it references.
    void noBrokenPictureWithoutBarcode()
    {
        const QString chromium = QStandardPaths::findExecutable("chromium");
        QVERIFY2(!chromium.isEmpty(), "chromium is installed by the setup");
        LabelData data("UPDATE tItems SET BarCode = '729000000001X' WHERE ItemKey = 'A2'");
        const QString temp = work.filePath("temp-refused");
        qputenv("Temp", temp.toUtf8());
        CardFixture f(QStringLiteral("[GeneralParams]\nDBPath=%1\nOptOLE3=True\nOptOLE0=False\n"
                                     "[LabelDef0]\nUseCell=-1\nFldID=4\nViewType=1\n"
                                     "[LabelBar]\nBarType=6\nUserResoX=0\nUserResoY=0\n").arg(data.folder).toUtf8());
        f.card->control<QPushButton>("cmdPrintItmes")->click();
        qunsetenv("Temp");
        directLabelLayout() = DirectLabelLayout{};
        QCOMPARE(f.pages->shown.size(), 1);

        // A page beside it loads the labels and counts their pictures, loaded and broken.
        const QString folder = QFileInfo(f.pages->shown.first()).absolutePath();
        const QString probe = folder + "/probe.htm";
        QFile p(probe);
        QVERIFY(p.open(QIODevice::WriteOnly));
        p.write("<html><body><iframe id=f src='tgrlab1.htm' onload=\"var d=document.getElementById('f').contentDocument;"
                "var ok=0,bad=0;for(var i of d.images){if(i.complete&&i.naturalWidth>0)ok++;else bad++;}"
                "document.title='pictures '+ok+' broken '+bad;\"></iframe></body></html>");
        p.close();
        QProcess browser;
        browser.start(chromium, {"--headless", "--no-sandbox", "--disable-gpu", "--no-first-run",
                                 "--allow-file-access-from-files", "--disable-background-networking",
                                 "--user-data-dir=" + work.filePath("profile2"), "--virtual-time-budget=10000",
                                 "--dump-dom", QUrl::fromLocalFile(probe).toString()});
        QVERIFY(browser.waitForFinished(120000));
        const QString dom = QString::fromUtf8(browser.readAllStandardOutput());
        // A1 prints twice with its picture; A2 (refused) and B1 (no value) without.
        QVERIFY2(dom.contains("<title>pictures 2 broken 0</title>"), qPrintable(dom.left(400)));
        QFile::remove(probe);
    }
};

QTEST_MAIN(TestDirectBrowser)
#include "tst_directbrowser.moc"
