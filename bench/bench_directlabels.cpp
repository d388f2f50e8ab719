// A direct-label job at scale: the pictures of one Code 128 line and the page
// for 10,000 labels, next to the zint command in batch mode making the same
// 10,000 BMP files, measured in the same run.
#include "labels/barcode.h"
#include "labels/directlabels.h"
#include "labels/directlayout.h"
#include "labels/itemquery.h"
#include "benchdata.h"

#include <QCoreApplication>
#include <QDir>
#include <QElapsedTimer>
#include <QFile>
#include <QProcess>
#include <QStandardPaths>
#include <QTemporaryDir>
#include <cstdio>

using namespace tagora;

int main(int argc, char** argv)
{
    QCoreApplication app(argc, argv);
    const int labels = argc > 1 ? QString::fromLocal8Bit(argv[1]).toInt() : 10000;
    QTemporaryDir dir;
    const QString docs = benchDataFolder(dir, labels, QStringLiteral(
        "INSERT INTO tItems (ItemKey, ItemName, BarCode, Price, Coin, Copies, PrintLabel)"
        " SELECT printf('IT%06d', i), 'פריט ' || i, printf('TG-%07d', i), i * 0.5, '$', 1, 1 FROM n"));
    if (docs.isEmpty())
        return 1;

    DirectLabelLayout layout;
    layout.lines[0].UseCell = true;
    layout.lines[0].FldID = 1;
    layout.lines[0].FieldName = QStringLiteral("ItemName");
    layout.lines[1].UseCell = true;
    layout.lines[1].FldID = 4;
    layout.lines[1].FieldName = QStringLiteral("BarCode");
    layout.lines[1].ViewType = 1;
    layout.bar.BarType = 2; // Code 128
    LabelQuerySettings q;
    q.sent[4] = true;
    const QString sql = BuildItemQuery(q, QueryByItems, OrderAscending);

    const QString job = dir.filePath(QStringLiteral("tgrlab"));
    PrepareJobFolder(job);
    QElapsedTimer t;
    t.start();
    ZintBarcodeLibrary library;
    LabelBarDef bar = layout.bar;
    QVector<BarcodeRefusal> refused;
    QString error = MakeBarcodeImages(job, QStringLiteral("BarCode"), 4, docs, sql, bar, library, &refused);
    const double pictures = t.elapsed() / 1000.0;
    if (error.isEmpty())
        error = CreateLabPage(job + QStringLiteral("/tgrlab1.htm"), docs, sql, layout, QStringLiteral("0.00"), nullptr);
    const double total = t.elapsed() / 1000.0;
    if (!error.isEmpty() || !refused.isEmpty()) {
        std::fprintf(stderr, "job failed: %s\n", qPrintable(error));
        return 1;
    }

    // The floor: zint's own command drawing the same data in batch mode.
    const QString batchDir = dir.filePath(QStringLiteral("zint"));
    QDir().mkpath(batchDir);
    QFile input(dir.filePath(QStringLiteral("data.txt")));
    input.open(QIODevice::WriteOnly);
    for (int i = 1; i <= labels; ++i)
        input.write(QStringLiteral("TG-%1\n").arg(i, 7, 10, QLatin1Char('0')).toLatin1());
    input.close();
    QProcess zint;
    t.restart();
    zint.start(QStandardPaths::findExecutable(QStringLiteral("zint")),
               {QStringLiteral("--batch"), QStringLiteral("-b"), QStringLiteral("20"), QStringLiteral("--scale=1"),
                QStringLiteral("--filetype=BMP"), QStringLiteral("-i"), input.fileName(), QStringLiteral("-o"),
                batchDir + QStringLiteral("/B~~~~~.bmp")});
    zint.waitForFinished(-1);
    const double floor = t.elapsed() / 1000.0;
    const int made = int(QDir(batchDir).entryList({QStringLiteral("*.bmp")}).size());

    std::printf("direct job: %d labels, pictures %.2f s, page %.2f s, total %.2f s (%.0f labels/s)\n", labels, pictures,
                total - pictures, total, labels / total);
    std::printf("zint --batch: %d pictures in %.2f s (%.0f/s)\n", made, floor, made / floor);
    std::printf("pictures vs zint --batch: %.2f times the floor\n", pictures / floor);
    return 0;
}
