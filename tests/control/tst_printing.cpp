// Printing for real from the print button: the marked items through a
// bridge chosen in the settings, out to paper's stand-ins (a PDF, a socket).
#include "support/cardfixture.h"
#include "support/cupsqueue.h"
#include "support/labeldata.h"

#include "labels/glabelsbridge.h"

#include <QCheckBox>
#include <QComboBox>
#include <QDir>
#include <QProcess>
#include <QPushButton>
#include <QRadioButton>
#include <QStandardPaths>
#include <QTcpServer>
#include <QTcpSocket>
#include <QtTest>

using namespace tagora;

namespace {
// The marked items of the label data, with barcodes a label can carry:
// A1 2 copies, A2 1, B1 3, printed sheets-wise (first to last).
const QString kBarcodes = QStringLiteral("UPDATE tItems SET BarCode = '7290000000022' WHERE ItemKey = 'A2';"
                                         "UPDATE tItems SET BarCode = '7290000000039', ItemName = 'Wash^er ~1'"
                                         " WHERE ItemKey = 'B1';"
                                         "UPDATE tItems SET ItemName = 'בורג O''Neil' WHERE ItemKey = 'A1';");

QString run(const QString& program, const QStringList& args)
{
    QProcess p;
    p.start(QStandardPaths::findExecutable(program), args);
    return p.waitForFinished(120000) ? QString::fromUtf8(p.readAllStandardOutput()) : QString();
}

std::unique_ptr<CardFixture> printingCard(const LabelData& data, const QString& label, const QString& automation,
                                          const QStringList& printers = {})
{
    auto f = std::make_unique<CardFixture>(QStringLiteral("[Automation]\n%1\n[GeneralParams]\nDBPath=%2\nLabelName=%3\n"
                                                          "OptOLE0=True\n")
                                               .arg(automation, data.folder, label)
                                               .toUtf8(),
                                           printers);
    f->c<QRadioButton>("OptPrinter(0)")->setChecked(true);
    for (int row : {0, 1, 4, 6})
        f->c<QCheckBox>(QStringLiteral("ChkFldSend(%1)").arg(row))->setChecked(true);
    return f;
}
} // namespace

class TestPrinting : public QObject {
    Q_OBJECT
    QTemporaryDir work;

private slots:
    void init() { qputenv("Temp", work.filePath(QStringLiteral("temp")).toUtf8()); }
    void cleanup() { qunsetenv("Temp"); }

    // Through the gLabels bridge to a CUPS queue: one page per label, in
    // order, with each item's texts and a barcode that reads back.
    void glabelsPdf()
    {
        if (QStandardPaths::findExecutable("glabels-3-batch").isEmpty()
            || QStandardPaths::findExecutable("pdftotext").isEmpty() || QStandardPaths::findExecutable("zbarimg").isEmpty())
            QSKIP("glabels-3-batch, pdftotext or zbarimg is not installed");
        if (const QString why = cupsqueue::unavailable(); !why.isEmpty())
            QSKIP(qPrintable(why));
        LabelData data(kBarcodes);
        QString error;
        const QString label = DemoGlabelsLabel(work.filePath("labels"), &error);
        QVERIFY2(!label.isEmpty(), qPrintable(error));
        const auto f = printingCard(data, label, QStringLiteral("Bridge=glabels"), {cupsqueue::kPdfQueue});
        auto* printers = f->c<QComboBox>("cmbPrinter");
        printers->setCurrentIndex(printers->findText(cupsqueue::kPdfQueue));
        cupsqueue::clear(cupsqueue::kPdfQueue);
        f->c<QPushButton>("cmdPrintItmes")->click();
        QCOMPARE(f->prompt->lines(), QStringList());
        const QString pdf = cupsqueue::waitForJob(cupsqueue::kPdfQueue);
        QVERIFY(!pdf.isEmpty());

        QStringList pages = run("pdftotext", {"-layout", pdf, "-"}).split('\f', Qt::SkipEmptyParts);
        QCOMPARE(pages.size(), 6);
        const QStringList keys{"A1", "A1", "A2", "B1", "B1", "B1"};
        for (int i = 0; i < 6; ++i)
            QVERIFY2(pages[i].contains(keys[i]), qPrintable(pages[i]));
        const QString png = work.filePath("page");
        run("pdftoppm", {"-r", "300", "-png", pdf, png});
        QStringList codes;
        for (const QString& name : QDir(work.path()).entryList({"page*.png"}, QDir::Files, QDir::Name))
            codes << run("zbarimg", {"-q", work.filePath(name)}).trimmed();
        QCOMPARE(codes, QStringList({"EAN-13:7290000000015", "EAN-13:7290000000015", "EAN-13:7290000000022",
                                     "EAN-13:7290000000039", "EAN-13:7290000000039", "EAN-13:7290000000039"}));
    }

    // Through the ZPL bridge to a printer's port: one format per record with
    // its copies, the values escaped and Hebrew in the order it is drawn.
    void zplToPort()
    {
        QTcpServer printer;
        QVERIFY(printer.listen(QHostAddress::LocalHost));
        QByteArray received;
        connect(&printer, &QTcpServer::newConnection, this, [&] {
            QTcpSocket* s = printer.nextPendingConnection();
            connect(s, &QTcpSocket::readyRead, this, [&, s] { received += s->readAll(); });
        });
        LabelData data(kBarcodes);
        const QString label = work.filePath("item.zpl");
        QFile t(label);
        QVERIFY(t.open(QIODevice::WriteOnly));
        t.write("^XA^FO10,10^A0N,30,30^FD${ItemKey} ${ItemName}^FS^FO10,50^FD${Price}^FS^BC^FD${BarCode}^FS^XZ");
        t.close();
        const auto f = printingCard(
            data, label, QStringLiteral("Bridge=zpl\nZplHost=127.0.0.1:%1\nTimeout=20").arg(printer.serverPort()));
        f->c<QPushButton>("cmdPrintItmes")->click();
        QCOMPARE(f->prompt->lines(), QStringList());
        QTRY_VERIFY(received.count("^XZ") == 3);
        const QString sent = QString::fromUtf8(received);
        const QStringList formats = sent.split("^XZ", Qt::SkipEmptyParts);
        QVERIFY2(formats[0].contains("^CI28") && formats[0].contains("A1 O'Neil גרוב") && formats[0].contains("^PQ2"),
                 qPrintable(formats[0]));
        QVERIFY2(formats[1].contains("^FD1.50") && formats[1].contains("^PQ1"), qPrintable(formats[1]));
        QVERIFY2(formats[2].contains("B1 Wash\\5Eer \\7E1") && formats[2].contains("^PQ3"), qPrintable(formats[2]));
    }
};

QTEST_MAIN(TestPrinting)
#include "tst_printing.moc"
