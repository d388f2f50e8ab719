#include "support/filelimit.h"

#include "labels/barcode.h"

#include <QDir>
#include <QFile>
#include <QImage>
#include <QProcess>
#include <QStandardPaths>
#include <QTemporaryDir>
#include <QtTest>

using namespace tagora;

namespace {

void writeStale(const QString& path)
{
    QFile f(path);
    QVERIFY(f.open(QIODevice::WriteOnly));
    f.write("a picture from an earlier job");
}

// Draws one picture the way a label line does: translation, one handle, one call.
bool drawWithZint(short position, const QString& data, LabelBarDef bar, const QString& file, QString* error,
                  bool* unwritten = nullptr)
{
    ZintBarcodeLibrary lib;
    const int code = libraryBarType(position, bar);
    const qint32 handle = lib.A1OpenInstance();
    const bool ok = DrawBarcode(data, file, bar, code, lib, handle, error, unwritten);
    lib.A1CloseInstance(handle);
    return ok;
}

} // namespace

class TestBarcode : public QObject {
    Q_OBJECT

    QString m_zbarimg;

    // The symbology zbar saw and the text it read, or empty texts.
    QPair<QString, QString> decode(const QString& file)
    {
        QProcess zbar;
        zbar.start(m_zbarimg, {QStringLiteral("-q"), file});
        if (!zbar.waitForFinished(60000))
            return {};
        QString out = QString::fromUtf8(zbar.readAllStandardOutput());
        out = out.section('\n', 0, 0);
        const int colon = int(out.indexOf(':'));
        if (colon < 0)
            return {};
        return {out.left(colon), out.mid(colon + 1)};
    }

private slots:
    void initTestCase()
    {
        m_zbarimg = QStandardPaths::findExecutable(QStringLiteral("zbarimg"));
        QVERIFY2(!m_zbarimg.isEmpty(), "zbarimg (package zbar-tools) is needed to read the pictures back");
    }

    // Numbers wider than the padding are written whole (the padded form is
    // read back by the direct-label tests through the page's picture names).
    void imageName() { QCOMPARE(BarcodeImageName(123, 123456), QStringLiteral("B123123456.BMP")); }

    // The working copy keeps the user's position, so lines sharing it agree.
    void translation_data()
    {
        QTest::addColumn<int>("position");
        QTest::addColumn<int>("lines");
        QTest::addColumn<int>("code");
        QTest::addColumn<bool>("fullAscii");
        // Each entry's own code is read back by the scanner in decodes().
        QTest::newRow("beyond the list") << 8 << 1 << 8 << false;
        QTest::newRow("two lines sharing CODE-128") << 2 << 2 << 1 << false;
        QTest::newRow("three lines sharing CODE-39 Ascii") << 1 << 3 << 0 << true;
    }
    void translation()
    {
        QFETCH(int, position);
        QFETCH(int, lines);
        QFETCH(int, code);
        QFETCH(bool, fullAscii);
        LabelBarDef working;
        working.BarType = short(position);
        for (int line = 0; line < lines; ++line) {
            QCOMPARE(libraryBarType(working.BarType, working), code);
            QCOMPARE(working.BarType, short(position));
        }
        QCOMPARE(working.C39Ascii, fullAscii);
    }

    // Every supported symbology, read back by a scanner program. The odd
    // names cover zint choosing the format by extension and its short buffer.
    void decodes_data()
    {
        QTest::addColumn<int>("position");
        QTest::addColumn<QString>("data");
        QTest::addColumn<bool>("checkDigit");
        QTest::addColumn<QString>("name");
        QTest::addColumn<QString>("symbology");
        QTest::addColumn<QString>("decoded");
        const QString b = BarcodeImageName(3, 12);
        QTest::newRow("CODE-39") << 0 << "TAG-42 $/+%." << false << b << "CODE-39" << "TAG-42 $/+%.";
        QTest::newRow("CODE-39 check character") << 0 << "TAG42" << true << b << "CODE-39" << "TAG42I";
        // zbar does not fold full-ASCII pairs back, so they show what was encoded.
        QTest::newRow("CODE-39 Ascii") << 1 << "ab#c" << false << b << "CODE-39" << "+A+B/C+C";
        QTest::newRow("CODE-128") << 2 << "Item-42 abc" << true << b << "CODE-128" << "Item-42 abc";
        QTest::newRow("CODE-128A") << 3 << "AB\tC-1" << false << b << "CODE-128" << "AB\tC-1";
        QTest::newRow("CODE-128B") << 4 << "Item-42 abc~" << false << b << "CODE-128" << "Item-42 abc~";
        QTest::newRow("EAN-8 check added") << 5 << "1234567" << true << b << "EAN-8" << "12345670";
        QTest::newRow("EAN-8 whole, check on") << 5 << "12345670" << true << b << "EAN-8" << "12345670";
        QTest::newRow("EAN-13") << 6 << "5901234123457" << false << b << "EAN-13" << "5901234123457";
        QTest::newRow("EAN-13 check added") << 6 << "590123412345" << true << b << "EAN-13" << "5901234123457";
        QTest::newRow("2 of 5") << 7 << "123456" << false << b << "I2/5" << "123456";
        QTest::newRow("2 of 5 check added") << 7 << "1234567" << true << b << "I2/5" << "12345670";
        QTest::newRow("png name") << 2 << "Item" << false << "B0300012.png" << "CODE-128" << "Item";
        QTest::newRow("Hebrew folder") << 2 << "Item" << false << "תוויות/B.bmp" << "CODE-128" << "Item";
        QTest::newRow("long name") << 2 << "Item" << false << QString(QString(60, 'd') + '/').repeated(5) + b
                                   << "CODE-128" << "Item";
    }
    void decodes()
    {
        QFETCH(int, position);
        QFETCH(QString, data);
        QFETCH(bool, checkDigit);
        QFETCH(QString, name);
        QFETCH(QString, symbology);
        QFETCH(QString, decoded);
        QTemporaryDir dir;
        const QString file = dir.filePath(name);
        QVERIFY(QDir().mkpath(QFileInfo(file).path()));
        writeStale(file);
        LabelBarDef bar;
        bar.CheckDigit = checkDigit;
        bar.ShowDesc = true;
        QString error;

        QVERIFY2(drawWithZint(short(position), data, bar, file, &error), qPrintable(error));

        QFile written(file);
        QVERIFY(written.open(QIODevice::ReadOnly));
        QCOMPARE(written.read(2), QByteArray("BM"));
        QCOMPARE(decode(file), qMakePair(symbology, decoded));
        QCOMPARE(QFileInfo(file).dir().entryList(QDir::Files).size(), 1);
    }

    // Each refusal names the value, the barcode type as the designer lists it
    // and the reason, all in Hebrew but the value and the type.
    void refuses_data()
    {
        QTest::addColumn<int>("position");
        QTest::addColumn<QString>("data");
        QTest::addColumn<bool>("checkDigit");
        QTest::addColumn<QString>("type");
        QTest::addColumn<QString>("reason");
        QTest::newRow("letter in EAN-13") << 6 << "59012341234A7" << true << "EAN-13" << "התו 'A' אינו חוקי";
        QTest::newRow("EAN-13 wrong check digit") << 6 << "5901234123458" << true << "EAN-13" << "ספרת הביקורת שגויה: 8 במקום 7";
        QTest::newRow("EAN-8 wrong check digit") << 5 << "96385071" << true << "EAN-8" << "ספרת הביקורת שגויה: 1 במקום 4";
        QTest::newRow("EAN-13 short, check off") << 6 << "590123412345" << false << "EAN-13" << "אורך שגוי: 12 ספרות";
        QTest::newRow("EAN-8 data as EAN-13") << 6 << "1234567" << true << "EAN-13" << "או 13 עם ספרת הביקורת";
        QTest::newRow("lower case in CODE-39") << 0 << "tag-42" << false << "CODE-39" << "אין אותיות קטנות";
        QTest::newRow("hash in CODE-39") << 0 << "TAG#42" << false << "CODE-39" << "התו '#' אינו חוקי";
        QTest::newRow("Hebrew in CODE-39 Ascii") << 1 << "AB-א" << false << "CODE-39 Ascii" << "התו 'א' אינו חוקי";
        QTest::newRow("CODE-128 too long") << 2 << QString(161, 'A') << false << "CODE-128" << "ארוך מדי";
        // A character beyond the basic plane is named whole, never half a pair.
        QTest::newRow("emoji in CODE-128") << 2 << "AB😀" << false << "CODE-128" << "התו '😀' אינו חוקי";
        QTest::newRow("math letter in CODE-128B") << 4 << "𝐀1" << false << "CODE-128B" << "התו '𝐀' אינו חוקי";
        QTest::newRow("lower case in CODE-128A") << 3 << "abc" << false << "CODE-128A" << "התו 'a' אינו חוקי";
        QTest::newRow("control character in CODE-128B") << 4 << "A\tB" << false << "CODE-128B" << "תו הבקרה שקודו 9";
        QTest::newRow("odd count in 2 of 5") << 7 << "12345" << false << "Interleaved 2 of 5" << "מספר זוגי של ספרות";
        QTest::newRow("nothing to encode") << 2 << "" << false << "CODE-128" << "אין ערך";
        QTest::newRow("unknown library code") << 99 << "123" << false << "99" << "אינו נתמך";
    }
    void refuses()
    {
        QFETCH(int, position);
        QFETCH(QString, data);
        QFETCH(bool, checkDigit);
        QFETCH(QString, type);
        QFETCH(QString, reason);
        QTemporaryDir dir;
        const QString file = dir.filePath(BarcodeImageName(5, 1));
        writeStale(file);
        LabelBarDef bar;
        bar.CheckDigit = checkDigit;
        QString error;

        bool unwritten = true;
        QVERIFY(!drawWithZint(short(position), data, bar, file, &error, &unwritten));
        QVERIFY(!unwritten); // the value, not the file: the job goes on

        QVERIFY2(error.contains(reason), qPrintable(error));
        QVERIFY2(error.contains(type), qPrintable(error));
        QVERIFY2(error.contains(data.left(40)), qPrintable(error));
        // No English from the library: Latin letters only in the value and the type.
        QString rest = error;
        rest.remove(data.left(40)).remove("CODE-39 Ascii").remove(type);
        for (const QChar c : data)
            rest.remove(QStringLiteral("'%1'").arg(c));
        QVERIFY2(!rest.contains(QRegularExpression("[A-Za-z]")), qPrintable(error));
        QVERIFY(!QFile::exists(file));
    }

    // Unit 0 is the inch, drawn at 200 dots per inch; no text under the bars.
    void pictureSize_data()
    {
        QTest::addColumn<int>("position");
        QTest::addColumn<float>("dimX");
        QTest::addColumn<float>("barHeight");
        QTest::addColumn<QSize>("size");
        // 79 modules and 10 quiet modules each side.
        QTest::newRow("CODE-128 0.01 by 0.5") << 2 << 0.01f << 0.5f << QSize(198, 100);
        // A width that cannot be drawn is the usual 0.01.
        QTest::newRow("CODE-128 negative width") << 2 << -0.02f << 0.5f << QSize(198, 100);
        QTest::newRow("CODE-128 width not a number") << 2 << std::numeric_limits<float>::quiet_NaN() << 0.5f << QSize(198, 100);
        QTest::newRow("CODE-128 0.015 by 1") << 2 << 0.015f << 1.0f << QSize(297, 200);
        // 95 modules, 11 and 7 quiet modules; guard bars reach 5 modules lower.
        QTest::newRow("EAN-13 0.01 by 0.5") << 6 << 0.01f << 0.5f << QSize(226, 110);
    }
    void pictureSize()
    {
        QFETCH(int, position);
        QFETCH(float, dimX);
        QFETCH(float, barHeight);
        QFETCH(QSize, size);
        QTemporaryDir dir;
        const QString file = dir.filePath(BarcodeImageName(1, 1));
        LabelBarDef bar;
        bar.DimX = dimX;
        bar.BarHeight = barHeight;
        QString error;

        const QString data = position == 6 ? QStringLiteral("5901234123457") : QStringLiteral("12345678");
        QVERIFY2(drawWithZint(short(position), data, bar, file, &error), qPrintable(error));

        QCOMPARE(QImage(file, "BMP").size(), size);
    }

    // A disk that fills up while zint writes: zint reports success on a cut
    // file, so the picture is measured, and none is left at the page's name.
    void fullDisk_data()
    {
        QTest::addColumn<int>("limit");
        QTest::addColumn<bool>("made");
        QTest::newRow("nothing written") << 0 << false;
        QTest::newRow("cut short") << 1000 << false;
        QTest::newRow("room enough") << (1 << 20) << true;
    }
    void fullDisk()
    {
        QFETCH(int, limit);
        QFETCH(bool, made);
        QTemporaryDir dir;
        const QString file = dir.filePath(BarcodeImageName(4, 1));
        const LimitedRun run = runWithFileLimit(rlim_t(limit), [&] {
            ZintBarcodeLibrary lib;
            const qint32 handle = lib.A1OpenInstance();
            QString error;
            bool unwritten = false;
            const bool ok = DrawBarcode(QStringLiteral("7290000000015"), file, LabelBarDef(), 1, lib, handle, &error, &unwritten);
            return QStringLiteral("%1|%2|%3").arg(ok).arg(unwritten).arg(error).toUtf8();
        });
        QVERIFY(run.exited);
        const QStringList report = QString::fromUtf8(run.report).split('|');
        QCOMPARE(report.size(), 3);
        QCOMPARE(report[0], QString::number(made));
        QCOMPARE(report[1], QString::number(!made)); // the file, not the value
        QCOMPARE(QFile::exists(file), made);
        if (made)
            QCOMPARE(decode(file).second, QStringLiteral("7290000000015"));
        else
            QVERIFY2(report[2].contains(QStringLiteral("לא נכתבה במלואה")), qPrintable(report[2]));
    }

    // A link planted at the picture's name is taken away, not written
    // through: whatever it points at stays as it was.
    void linkAtName_data()
    {
        QTest::addColumn<bool>("dangling");
        QTest::newRow("link to a file") << false;
        QTest::newRow("dangling link") << true;
    }
    void linkAtName()
    {
        QFETCH(bool, dangling);
        QTemporaryDir dir;
        const QString target = dir.filePath(QStringLiteral("outside.txt"));
        if (!dangling)
            writeStale(target);
        const QString file = dir.filePath(BarcodeImageName(1, 7));
        QVERIFY(QFile::link(target, file));
        QString error;

        QVERIFY2(drawWithZint(2, QStringLiteral("Item"), LabelBarDef(), file, &error), qPrintable(error));

        QVERIFY(!QFileInfo(file).isSymLink());
        QCOMPARE(decode(file).second, QStringLiteral("Item"));
        QFile outside(target);
        QCOMPARE(outside.exists(), !dangling);
        if (!dangling) {
            QVERIFY(outside.open(QIODevice::ReadOnly));
            QCOMPARE(outside.readAll(), QByteArray("a picture from an earlier job"));
        }
    }

    void closedHandle()
    {
        QTemporaryDir dir;
        const QString file = dir.filePath(BarcodeImageName(2, 3));
        ZintBarcodeLibrary lib;
        const qint32 handle = lib.A1OpenInstance();
        QCOMPARE(lib.openInstances(), 1);
        LabelBarDef bar;
        QString error;
        QVERIFY2(DrawBarcode(QStringLiteral("Item"), file, bar, 1, lib, handle, &error), qPrintable(error));

        lib.A1CloseInstance(handle);

        QCOMPARE(lib.openInstances(), 0);
        QVERIFY(!DrawBarcode(QStringLiteral("Item"), file, bar, 1, lib, handle, &error));
        QVERIFY2(error.contains(QStringLiteral("אינו פתוח")), qPrintable(error));
        QVERIFY(!QFile::exists(file));
    }
};

QTEST_GUILESS_MAIN(TestBarcode)
#include "tst_barcode.moc"
