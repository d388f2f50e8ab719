// Direct labels printed automatically on a chosen printer: the page goes to
// the printer as a PDF made by headless Chromium, and what reached the test
// server's queue carries every label's barcode.
#include "support/cardfixture.h"
#include "support/cupsqueue.h"
#include "support/labeldata.h"

#include "labels/directlayout.h"
#include "labels/pagepdf.h"

#include <QComboBox>
#include <QProcess>
#include <QPushButton>
#include <QtTest>

using namespace tagora;

namespace {
QStringList decodeBarcodes(const QString& pdf, const QString& folder)
{
    QProcess render;
    render.start(QStringLiteral("pdftoppm"), {QStringLiteral("-r"), QStringLiteral("300"), QStringLiteral("-png"), pdf,
                                              folder + QStringLiteral("/page")});
    if (!render.waitForFinished(120000))
        return {QStringLiteral("pdftoppm did not finish")};
    QStringList decoded;
    for (const QString& png : QDir(folder).entryList({QStringLiteral("page*.png")}, QDir::Files, QDir::Name)) {
        QProcess reader;
        reader.start(QStringLiteral("zbarimg"), {QStringLiteral("-q"), QDir(folder).filePath(png)});
        reader.waitForFinished(60000);
        decoded += QString::fromUtf8(reader.readAllStandardOutput()).split(QLatin1Char('\n'), Qt::SkipEmptyParts);
    }
    decoded.sort();
    return decoded;
}
} // namespace

class TestDirectPdf : public QObject {
    Q_OBJECT
    QTemporaryDir work;

private slots:
    void initTestCase()
    {
        // Choosing the printer makes it the default destination: kept in a
        // folder of the test's own, never the machine's or the user's.
        qputenv("CUPS_SERVERROOT", work.filePath(QStringLiteral("cupsroot")).toUtf8());
        QDir().mkpath(work.filePath(QStringLiteral("cupsroot")));
        qputenv("HOME", work.path().toUtf8());
    }

    void printsOrShows_data()
    {
        QTest::addColumn<bool>("autoPrint");
        QTest::addColumn<QString>("printer");
        QTest::addColumn<bool>("printed"); // the queue received the PDF
        QTest::addColumn<bool>("shown");   // the browser window opened
        QTest::addColumn<bool>("fault");
        QTest::newRow("auto print on a printer") << true << QStringLiteral("tagora-pdf") << true << false << false;
        QTest::newRow("printer refuses jobs") << true << QStringLiteral("tagora-reject") << false << false << true;
        QTest::newRow("auto print, no printer") << true << QString() << false << true << false;
        QTest::newRow("printer, no auto print") << false << QStringLiteral("tagora-pdf") << false << true << false;
    }

    void printsOrShows()
    {
        if (const QString why = cupsqueue::unavailable(); !why.isEmpty())
            QSKIP(qPrintable(why));
        for (const char* tool : {"pdftoppm", "pdftotext", "zbarimg"})
            if (QStandardPaths::findExecutable(QString::fromLatin1(tool)).isEmpty())
                QSKIP("poppler-utils and zbar-tools are not installed");
        if (findHeadlessBrowser().isEmpty())
            QSKIP("chromium is not installed");
        QFETCH(bool, autoPrint);
        QFETCH(QString, printer);
        QFETCH(bool, printed);
        QFETCH(bool, shown);
        QFETCH(bool, fault);

        LabelData data;
        const QString temp = work.filePath(QStringLiteral("temp-%1").arg(QTest::currentDataTag()));
        qputenv("Temp", temp.toUtf8());
        CardFixture f(QStringLiteral("[GeneralParams]\nDBPath=%1\nOptOLE3=True\nOptOLE0=False\n"
                                     "[LabelDef0]\nUseCell=-1\nFldID=4\nViewType=1\n"
                                     "[LabelDef1]\nUseCell=-1\nFldID=1\n"
                                     "[LabelBar]\nBarType=2\nDimX=0.01\nBarHeight=0.3\nUserResoX=0\nUserResoY=0\n"
                                     "[DirectLabel]\nPageRows=8\nPageCols=2\nPageAutoPrint=%2\n")
                          .arg(data.folder, autoPrint ? QStringLiteral("-1") : QStringLiteral("0"))
                          .toUtf8(),
                      {QStringLiteral("tagora-pdf"), QStringLiteral("tagora-reject")});
        auto* printers = f.c<QComboBox>(QStringLiteral("cmbPrinter"));
        printers->setCurrentIndex(printer.isEmpty() ? -1 : printers->findText(printer));
        cupsqueue::clear(cupsqueue::kPdfQueue);

        f.card->control<QPushButton>(QStringLiteral("cmdPrintItmes"))->click();
        qunsetenv("Temp");
        directLabelLayout() = DirectLabelLayout{};

        const QStringList lines = f.prompt->lines();
        QCOMPARE(f.pages->shown.size(), shown ? 1 : 0);
        QCOMPARE(lines.size(), fault ? 1 : 0);
        if (fault)
            QVERIFY2(lines.first().startsWith(QStringLiteral("תקלה: ")) && lines.first().contains(printer),
                     qPrintable(lines.first()));
        if (!printed) {
            QVERIFY(!QFileInfo::exists(cupsqueue::outputFile(cupsqueue::kPdfQueue)));
            return;
        }
        const QString pdf = cupsqueue::waitForJob(cupsqueue::kPdfQueue);
        QVERIFY(!pdf.isEmpty());
        // Every barcode of the records, read from the printed page (the
        // reader reports a value once per page however often it is there).
        const QString pages = work.filePath(QStringLiteral("render"));
        QDir().mkpath(pages);
        QStringList decoded = decodeBarcodes(pdf, pages);
        decoded.removeDuplicates();
        QCOMPARE(decoded, QStringList({QStringLiteral("CODE-128:7290000000015"), QStringLiteral("CODE-128:72900000000280")}));
        // The copies: Bolt twice, Nut once, Washer (no barcode) three times.
        QProcess text;
        text.start(QStringLiteral("pdftotext"), {pdf, QStringLiteral("-")});
        QVERIFY(text.waitForFinished(60000));
        const QString words = QString::fromUtf8(text.readAllStandardOutput());
        QCOMPARE(words.count(QStringLiteral("Bolt")), 2);
        QCOMPARE(words.count(QStringLiteral("Nut")), 1);
        QCOMPARE(words.count(QStringLiteral("Washer")), 3);
    }

    // A page the browser cannot turn into a PDF leaves no PDF behind.
    void renderFailures_data()
    {
        QTest::addColumn<QString>("page");
        QTest::addColumn<QString>("browser");
        QTest::newRow("page calls print on load")
            << QStringLiteral("<html><body onload='window.print()'>x</body></html>") << QString();
        QTest::newRow("browser missing") << QStringLiteral("<html><body>x</body></html>")
                                         << QStringLiteral("/nonexistent/chromium");
        QTest::newRow("browser fails") << QStringLiteral("<html><body>x</body></html>") << QStringLiteral("/bin/false");
    }

    void renderFailures()
    {
        QFETCH(QString, page);
        QFETCH(QString, browser);
        if (browser.isEmpty() && findHeadlessBrowser().isEmpty())
            QSKIP("chromium is not installed");
        const QString html = work.filePath(QStringLiteral("fail.htm"));
        const QString pdf = work.filePath(QStringLiteral("fail.pdf"));
        QFile f(html);
        QVERIFY(f.open(QIODevice::WriteOnly));
        f.write(page.toUtf8());
        f.close();
        const QString error = RenderPageToPdf(html, pdf, 60, browser);
        QVERIFY(!error.isEmpty());
        QVERIFY(!QFileInfo::exists(pdf));
        QVERIFY(!QFileInfo::exists(pdf + QStringLiteral(".part")));
    }
};

QTEST_MAIN(TestDirectPdf)
#include "tst_directpdf.moc"
