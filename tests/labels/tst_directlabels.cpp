// The direct-label page, its pictures and the job as the print button runs it.
#include "support/cardfixture.h"
#include "support/filelimit.h"
#include "support/labeldata.h"

#include "erp/textconv.h"
#include "labels/barcode.h"
#include "labels/directlabels.h"
#include "labels/directlayout.h"
#include "labels/itemquery.h"
#include "platform/pageviewer.h"

#include <QCheckBox>
#include <QLineEdit>
#include <QPushButton>
#include <QRadioButton>
#include <QStringDecoder>
#include <QtEndian>
#include <QtTest>

#include <map>
#include <sys/stat.h>

using namespace tagora;

namespace {
QString readPage(const QString& path)
{
    QFile f(path);
    f.open(QIODevice::ReadOnly);
    return QStringDecoder("windows-1255").decode(f.readAll());
}

// Refused barcodes for the message: record number and labels on the page.
using Refused = QList<QPair<int, int>>;

// How the browser lays out the name line of the first label, left to right:
// "cells:" and the cells of a right-to-left letter table (each bracket drawn
// mirrored, as in any right-to-left cell), or "text:" and the text of a single
// cell, which the browser orders by the text's own direction.
QString nameLine(const QString& html, int line)
{
    const QString table = html.section(QStringLiteral("<td class='L%1'>").arg(line), 1, 1).section("</table>", 0, 0);
    static const QRegularExpression cell("<td[^>]*>(.*?)</td>");
    QStringList cells;
    for (auto it = cell.globalMatch(table); it.hasNext();) {
        QString c = it.next().captured(1);
        c.replace("&nbsp;", " ").replace("&lt;", "<").replace("&gt;", ">").replace("&#39;", "'").replace("&amp;", "&");
        cells << c;
    }
    if (cells.size() == 1 && table.contains("<td nowrap>"))
        return "text:" + cells.first();
    const QString mirror = "()<>[]{}";
    QString shown;
    for (const QString& c : cells) {
        const int m = c.size() == 1 ? int(mirror.indexOf(c)) : -1;
        shown.prepend(m < 0 ? c : QString(mirror[m ^ 1]));
    }
    return "cells:" + shown;
}

// The first line a barcode picture, the bars of a symbology that takes any value.
const char* const barcodeIni = "[LabelDef0]\nUseCell=-1\nFldID=4\nViewType=1\n[LabelBar]\nBarType=2\n";

LabelLineDef textLine(short field, const QString& column, const QString& prefix = {}, bool price = false)
{
    LabelLineDef l;
    l.UseCell = true;
    l.FldID = field;
    l.FieldName = column;
    l.Prefix = prefix;
    l.IsPrice = price;
    return l;
}
} // namespace

class TestDirectLabels : public QObject {
    Q_OBJECT
    QTemporaryDir work;
    int pages = 0;
    const QByteArray runtimeDir = qgetenv("XDG_RUNTIME_DIR");
    const QByteArray cacheHome = qgetenv("XDG_CACHE_HOME");

    static void writeFile(const QString& path, const QByteArray& bytes)
    {
        QFile f(path);
        QVERIFY(f.open(QIODevice::WriteOnly) && f.write(bytes) == bytes.size());
    }
    static QByteArray readFile(const QString& path)
    {
        QFile f(path);
        return f.open(QIODevice::ReadOnly) ? f.readAll() : QByteArray("(missing)");
    }

    // A page for the items of `range`, with their copies, in key order.
    QString page(const LabelData& data, const DirectLabelLayout& layout, const QString& range,
                 const QString& format = "0.00")
    {
        LabelQuerySettings q;
        q.itemRangeCriteria = range;
        q.sent.fill(true);
        for (int i = 33; i < 38; ++i)
            q.expressions[size_t(i)] = "1";
        const QString file = work.filePath(QStringLiteral("page%1.htm").arg(++pages));
        const QString error = CreateLabPage(file, data.docs, BuildItemQuery(q, 1, 1), layout, format, nullptr);
        return error.isEmpty() ? readPage(file) : "error: " + error;
    }

    // A control that prints direct labels from data's folder; its job folder is under `temp`.
    static std::unique_ptr<CardFixture> directCard(const LabelData& data, const QString& temp, const QString& ini)
    {
        qputenv("Temp", temp.toUtf8());
        return std::make_unique<CardFixture>(
            QStringLiteral("[GeneralParams]\nDBPath=%1\nOptOLE3=True\nOptOLE0=False\n%2").arg(data.folder, ini).toUtf8());
    }

private slots:
    // The layout the control prints with is shared; each test starts from none.
    void cleanup()
    {
        directLabelLayout() = DirectLabelLayout{};
        qunsetenv("Temp");
        qputenv("XDG_RUNTIME_DIR", runtimeDir);
        qputenv("XDG_CACHE_HOME", cacheHome);
    }

    // 2, 1 and 4 copies on a 2 x 2 page: seven labels on two pages, the last cell empty.
    void copiesFillPages()
    {
        LabelData data("UPDATE tItems SET Copies = CASE ItemKey WHEN 'A1' THEN 2 WHEN 'A2' THEN 1 ELSE 4 END");
        DirectLabelLayout layout;
        layout.page.PageRows = 2;
        layout.page.PageCols = 2;
        layout.lines[0] = textLine(0, "ItemKey");
        layout.lines[1] = textLine(4, "BarCode");
        layout.lines[1].ViewType = 1;
        // The picture drawn for A1 (not a BMP: no size to keep for the others).
        writeFile(work.filePath("B0400001.BMP"), "picture");
        const QString html = page(data, layout, " And ItemKey <= 'B1'");
        QCOMPARE(html.count("<table height='100%' width='100%' border='0'>"), 2);
        QCOMPARE(html.count("<td class='L0'>"), 7);
        QCOMPARE(html.count("<tr><td nowrap>&nbsp;</td></tr>"), 1);
        QVERIFY(html.lastIndexOf("&nbsp;</td></tr>") > html.lastIndexOf("<td class='L0'>"));
        // One picture name per record, however many copies; a record with no
        // barcode value (B1), or whose picture was not drawn (A2), gets empty
        // cells of the picture's size rather than a broken picture.
        QCOMPARE(html.count("B0400001.BMP"), 2);
        QCOMPARE(html.count("B0400003.BMP"), 0);
        QCOMPARE(html.count("<td class='L1'><div style='display:inline-block; width:100px; height:50px;'></div></td>"), 5);
        QCOMPARE(html.count("\r\n"), html.count('\n'));
        QVERIFY(html.endsWith("</BODY>\r\n</HTML>\r\n"));
    }

    // Copies beyond a byte, and none at all, neither stop nor shorten the page.
    void unusualCopies()
    {
        LabelData data("UPDATE tItems SET Copies = CASE ItemKey WHEN 'A1' THEN 300 WHEN 'A2' THEN NULL ELSE 0 END");
        DirectLabelLayout layout;
        layout.lines[0] = textLine(0, "ItemKey");
        const QString html = page(data, layout, " And ItemKey <= 'B1'");
        QCOMPARE(html.count("<td class='L0'>A1</td>"), 300);
        QVERIFY(!html.contains("<td class='L0'>A2</td>"));
        QVERIFY(!html.contains("<td class='L0'>B1</td>"));
        QCOMPARE(html.count("<table height='100%'"), 13); // 300 labels, 24 to a page
    }

    void cellText_data()
    {
        QTest::addColumn<QString>("prefix");
        QTest::addColumn<int>("maxLen");
        QTest::addColumn<QString>("value");
        QTest::addColumn<bool>("price");
        QTest::addColumn<QString>("format");
        QTest::addColumn<QString>("cell");
        QTest::newRow("prefix counts in the cut") << "ab" << 5 << "12345" << false << "" << "ab 12";
        QTest::newRow("prefix of an empty value") << "ab" << 0 << "" << false << "" << "ab ";
        QTest::newRow("price with its sign") << "" << 0 << "3.5" << true << "" << "3.50 $";
        QTest::newRow("price pattern") << "" << 0 << "1234.5" << true << "#,##0.00" << "1,234.50 $";
        QTest::newRow("markup is text") << "" << 0 << "<b>&'x'" << false << "" << "&lt;b&gt;&amp;&#39;x&#39;";
        // The page is in the Hebrew code page; what it lacks goes as a character reference.
        QTest::newRow("code page") << "" << 0 << "בורג ش €" << false << "" << "בורג &#1588; €";
        // Beyond the basic plane: one reference per character, and a cut that
        // counts characters keeps an emoji whole.
        QTest::newRow("emoji and math letter") << "" << 0 << "😀 𝐀" << false << "" << "&#128512; &#119808;";
        QTest::newRow("cut after an emoji") << "" << 2 << "😀😀😀" << false << "" << "&#128512;&#128512;";
        QTest::newRow("cut counts the prefix's emoji") << "😀" << 3 << "𝐀bc" << false << "" << "&#128512; &#119808;";
    }
    void cellText()
    {
        QFETCH(QString, prefix);
        QFETCH(int, maxLen);
        QFETCH(QString, value);
        QFETCH(bool, price);
        QFETCH(QString, format);
        QFETCH(QString, cell);
        LabelData data(QStringLiteral("UPDATE tItems SET ItemName = '%1', Coin = '$', Copies = 1 WHERE ItemKey = 'A1'")
                           .arg(QString(value).replace("'", "''")));
        DirectLabelLayout layout;
        layout.page.MaxTextLen = short(maxLen);
        layout.lines[3] = textLine(1, "ItemName", prefix, price);
        const QString html = page(data, layout, " And ItemKey = 'A1'", format);
        QVERIFY2(html.contains("<td class='L3'>" + cell + "</td>"), qPrintable(html.section("<td class='L3'>", 1, 1).left(60)));
    }

    void pageShape_data()
    {
        QTest::addColumn<int>("rows");
        QTest::addColumn<int>("cols");
        QTest::addColumn<bool>("autoPrint");
        QTest::addColumn<int>("resoX");
        QTest::addColumn<int>("resoY");
        QTest::addColumn<QStringList>("expected");
        QTest::newRow("4 by 6") << 6 << 4 << false << 100 << 0
                                << QStringList{"<td width='25.0%' height='16.7%' align='center'>", "<BODY BGCOLOR='#FFFFFF'>\r\n",
                                               "<img src='B0400001.BMP'  width=100></img>"};
        QTest::newRow("one column, printing itself") << 12 << 1 << true << 0 << 40
                                                     << QStringList{"<td width='100.0%' height='08.3%' align='center'>",
                                                                    "<BODY onload='window.print()'\r\n BGCOLOR='#FFFFFF'>\r\n",
                                                                    "<img src='B0400001.BMP'  height=40></img>"};
    }
    void pageShape()
    {
        QFETCH(int, rows);
        QFETCH(int, cols);
        QFETCH(bool, autoPrint);
        QFETCH(int, resoX);
        QFETCH(int, resoY);
        QFETCH(QStringList, expected);
        LabelData data;
        DirectLabelLayout layout;
        layout.page.PageRows = short(rows);
        layout.page.PageCols = short(cols);
        layout.page.PageAutoPrint = autoPrint;
        layout.bar.UserResoX = short(resoX);
        layout.bar.UserResoY = short(resoY);
        layout.lines[0] = textLine(4, "BarCode");
        layout.lines[0].ViewType = 1;
        writeFile(work.filePath("B0400001.BMP"), "picture");
        const QString html = page(data, layout, " And ItemKey = 'A1'");
        for (const QString& e : expected)
            QVERIFY2(html.contains(e), qPrintable(e));
    }

    void emptyQueryEndsAfterBody()
    {
        LabelData data;
        DirectLabelLayout layout;
        layout.lines[0] = textLine(0, "ItemKey");
        QVERIFY(page(data, layout, " And ItemKey = 'none'").endsWith(" BGCOLOR='#FFFFFF'>\r\n"));
    }

    void styles()
    {
        DirectLabelLayout layout;
        layout.lines[2] = textLine(1, "ItemName");
        layout.lines[2].FontSize = 12;
        layout.lines[2].FontItalic = true;
        layout.lines[2].FontUL = true;
        layout.lines[2].Direction = 0;
        layout.lines[2].Height = 14;
        layout.lines[2].Border = true;
        layout.page.LabTop = 3;
        // A line's settings reach its own class, and the page's margins the page.
        const QStringList rules = WriteLabelStyles(layout);
        QVERIFY(rules.first().trimmed().startsWith(".L2 {"));
        for (const char* part : {"font-size:12pt", "font-style:Italic", "underline", "direction:ltr", "height: 14pt", "border:"})
            QVERIFY2(rules.first().contains(part), part);
        QVERIFY(rules.last().endsWith("margin-top: 3; margin-bottom: 0}"));
    }

    void letterTable_data()
    {
        QTest::addColumn<QVariant>("value");
        QTest::addColumn<QString>("cls");
        QTest::addColumn<QString>("cells");
        const QString sep(kCellSeparator);
        QTest::newRow("run of blanks is one cell") << QVariant("a  b") << "L2" << "<td>a</td><td>&nbsp;</td><td>b</td>";
        QTest::newRow("separators dropped") << QVariant(sep + "x" + sep + "<" + sep) << "" << "<td>x</td><td>&lt;</td>";
        QTest::newRow("null") << QVariant() << "L1" << "";
        QTest::newRow("emoji is one cell") << QVariant("a😀" + sep + "𝐀") << "" << "<td>a</td><td>😀</td><td>𝐀</td>";
    }
    void letterTable()
    {
        QFETCH(QVariant, value);
        QFETCH(QString, cls);
        QFETCH(QString, cells);
        const QString open = cls.isEmpty() ? QString("<table") : "<table class='" + cls + "'";
        QCOMPARE(LetterTable(value, cls), open + " cellspacing='0' cellpadding='0' border='0' align='right' dir='rtl'><tr>"
                                              + cells + "</tr></table>");
    }

    // The name line as the item import stores it for each connection type
    // reads as the name: type 1 keeps the ERP's display order, type 2 the
    // logical order, which the browser must lay out itself.
    void nameLineReads_data()
    {
        QTest::addColumn<int>("connType");
        QTest::addColumn<QString>("erpText");
        QTest::addColumn<QString>("shown");
        QTest::newRow("type 1, Hebrew") << 1 << "החדקמ" << "cells:החדקמ";
        QTest::newRow("type 1, mixed") << 1 << "(Makita 18V) החדקמ" << "cells:(Makita 18V) החדקמ";
        QTest::newRow("type 2, Hebrew") << 2 << "מקדחה" << "text:מקדחה";
        QTest::newRow("type 2, mixed") << 2 << "מקדחה (Makita 18V) <2>" << "text:מקדחה (Makita 18V) <2>";
        QTest::newRow("type 1, emoji") << 1 << "😀 𝐀 החדקמ" << "cells:&#128512; &#119808; החדקמ";
        QTest::newRow("type 2, emoji") << 2 << "מקדחה 😀𝐀" << "text:מקדחה &#128512;&#119808;";
    }
    void nameLineReads()
    {
        QFETCH(int, connType);
        QFETCH(QString, erpText);
        QFETCH(QString, shown);
        LabelData data(QStringLiteral("UPDATE tItems SET VNItemName = '%1' WHERE ItemKey = 'A1'")
                           .arg(ReverseForCells(erpText, short(connType)).replace("'", "''")));
        DirectLabelLayout layout;
        layout.lines[2] = textLine(16, "VNItemName");
        setErpConnType(short(connType));
        const QString html = page(data, layout, " And ItemKey = 'A1'");
        setErpConnType(1);
        QCOMPARE(nameLine(html, 2), shown);
    }

    // The attention message counts labels on the page, not records: a record
    // with copies is several labels, one refused on two lines is still its
    // labels once, and one with no copies is not on the page.
    void refusalMessage_data()
    {
        QTest::addColumn<Refused>("refused");
        QTest::addColumn<int>("onPage");
        QTest::addColumn<QString>("head");
        QTest::addColumn<int>("listed");
        using R = Refused;
        QTest::newRow("copies count") << R{{2, 3}, {5, 1}} << 9 << "4 מתוך 9 המדבקות שבדף יודפסו בלי ברקוד" << 2;
        QTest::newRow("two lines, one record") << R{{2, 3}, {2, 3}} << 9 << "3 מתוך 9 המדבקות" << 2;
        QTest::newRow("not on the page") << R{{3, 0}} << 9 << "" << 0;
    }
    void refusalMessage()
    {
        QFETCH(Refused, refused);
        QFETCH(int, onPage);
        QFETCH(QString, head);
        QFETCH(int, listed);
        QVector<BarcodeRefusal> list;
        for (const auto& [record, labels] : refused)
            list.push_back({record, labels, "12", QStringLiteral("ברקוד EAN-13 לערך \"12\": אורך שגוי")});
        const QString message = BarcodeRefusalMessage(list, onPage);
        if (head.isEmpty()) {
            QVERIFY(message.isEmpty());
            return;
        }
        const QStringList lines = message.split('\n');
        QVERIFY2(lines.first().startsWith(head), qPrintable(lines.first()));
        QCOMPARE(lines.size() - 1, listed);
    }

    void layoutInSettings()
    {
        QTemporaryDir d;
        IniSettingsStore store(d.filePath("s.ini"));
        DirectLabelLayout layout;
        layout.lines[4] = textLine(31, "SalPackUN", "יח'");
        layout.bar.DimX = 0.02f;
        SetGetLabelDefs(1, layout, store);
        QCOMPARE(store.value("Tagora", "LabelDef4", "UseCell").value_or("?"), QString("-1"));
        QCOMPARE(store.value("Tagora", "LabelBar", "DimX").value_or("?"), QString("0.02"));
        store.setValue("Tagora", "LabelDef4", "Border", "True");
        store.setValue("Tagora", "LabelDef4", "FontSize", "huge");
        DirectLabelLayout back;
        SetGetLabelDefs(2, back, store);
        QCOMPARE(back.lines[4].FldID, short(31));
        QCOMPARE(back.lines[4].Prefix, QString("יח'"));
        QVERIFY(back.lines[4].Border);
        QCOMPARE(back.lines[4].FontSize, uchar(9)); // a value that does not read keeps the field's
        QCOMPARE(back.bar.DimX, 0.02f);
        // A negative symbology keeps the bar section out of the store both ways.
        back.bar.BarType = -1;
        back.bar.DimX = 0.5f;
        SetGetLabelDefs(2, back, store);
        QCOMPARE(back.bar.DimX, 0.5f);
    }

    // A job with a value its barcode cannot carry: the page opens without its
    // picture, then the message counts that record's labels against the
    // page's, in Hebrew.
    void printButtonReportsRefusals()
    {
        LabelData data("UPDATE tItems SET BarCode = '729000000001X', Copies = 4 WHERE ItemKey = 'A2'");
        const auto f = directCard(data, work.filePath("temp-refused"),
                                  "[LabelDef0]\nUseCell=-1\nFldID=4\nViewType=1\n[LabelBar]\nBarType=6\nUserResoX=0\nUserResoY=0\n");
        f->c<QPushButton>("cmdPrintItmes")->click();
        QCOMPARE(f->pages->shown.size(), 1);
        // A roll takes B1 (no barcode), A2 (refused), A1: one picture, A1's.
        QCOMPARE(QDir(work.filePath("temp-refused/tgrlab")).entryList({"*.BMP"}), QStringList{"B0400003.BMP"});
        QCOMPARE(f->prompt->criticalCount(), 0);
        QCOMPARE(f->prompt->lines().size(), 1);
        const QString shown = f->prompt->lines().first();
        // A1 2, A2 4 and B1 3 copies: nine labels, A2's four without their barcode.
        QVERIFY2(shown.startsWith(QString::fromUtf8("שימו לב: 4 מתוך 9 המדבקות שבדף")), qPrintable(shown));
        QVERIFY2(shown.contains("729000000001X") && shown.contains("EAN-13"), qPrintable(shown));
        QVERIFY2(!shown.contains(QRegularExpression("Error|Invalid|digits")), qPrintable(shown));

        // The page references only pictures that are there; A2 (refused) and
        // B1 (no value) keep the space of A1's picture, so the sheet does not shift.
        const QString html = readPage(f->pages->shown.first());
        static const QRegularExpression img("<img src='([^']*)'");
        QStringList referenced;
        for (auto it = img.globalMatch(html); it.hasNext();)
            referenced << it.next().captured(1);
        QCOMPARE(referenced, QStringList({"B0400003.BMP", "B0400003.BMP"}));
        const QString picture = QFileInfo(f->pages->shown.first()).absolutePath() + "/B0400003.BMP";
        const QByteArray bmp = readFile(picture);
        QVERIFY(bmp.startsWith("BM"));
        const int width = qFromLittleEndian<qint32>(bmp.constData() + 18);
        const int height = qAbs(qFromLittleEndian<qint32>(bmp.constData() + 22));
        const QString kept = QStringLiteral("<td class='L0'><div style='display:inline-block; width:%1px; height:%2px;'></div></td>")
                                 .arg(width)
                                 .arg(height);
        QCOMPARE(html.count(kept), 4 + 3);
    }

    // A disk that fills up during the job: the pictures or the page cannot be
    // written whole, so nothing is shown as printed; the user reads why.
    void fullDiskStopsTheJob_data()
    {
        QTest::addColumn<bool>("pictures");
        QTest::newRow("barcode pictures") << true;
        QTest::newRow("the page") << false;
    }
    void fullDiskStopsTheJob()
    {
        QFETCH(bool, pictures);
        LabelData data;
        const auto f = directCard(data, work.filePath(QStringLiteral("full%1").arg(pictures)),
                                  pictures ? barcodeIni : "[LabelDef0]\nUseCell=-1\nFldID=0\n");
        // Smaller than a picture or a page, larger than nothing.
        const LimitedRun run = runWithFileLimit(1000, [&] {
            f->c<QPushButton>("cmdPrintItmes")->click();
            return (QStringList{QString::number(f->pages->shown.size())} + f->prompt->lines()).join(QChar(0x1e)).toUtf8();
        });
        QVERIFY(run.exited);
        const QStringList report = QString::fromUtf8(run.report).split(QChar(0x1e));
        QCOMPARE(report.first(), QStringLiteral("0")); // no page shown
        QCOMPARE(report.size(), 2);                     // one message: no "attention" for missing barcodes
        QVERIFY2(report[1].startsWith(QString::fromUtf8("תקלה: ")), qPrintable(report[1]));
        QVERIFY2(report[1].contains(QString::fromUtf8("לא הודפסו מדבקות")), qPrintable(report[1]));
    }

    // A layout no sheet can hold is refused, naming the setting, before any
    // picture or page is made; up to the bounds it prints.
    void layoutBounds_data()
    {
        QTest::addColumn<QString>("key");
        QTest::addColumn<double>("value");
        QTest::addColumn<bool>("refused");
        QTest::newRow("32767 rows") << "PageRows" << 32767.0 << true;
        QTest::newRow("no columns") << "PageCols" << 0.0 << true;
        QTest::newRow("100 columns") << "PageCols" << 100.0 << false;
        QTest::newRow("huge margin") << "LabTop" << 32767.0 << true;
        QTest::newRow("font of 255 points") << "FontSize" << 255.0 << true;
        QTest::newRow("line of 32767 points") << "Height" << 32767.0 << true;
        QTest::newRow("narrow bar of an inch") << "DimX" << 1.0 << true;
        QTest::newRow("bars 3000 inches high") << "BarHeight" << 3000.0 << true;
        QTest::newRow("picture 32767 wide") << "UserResoX" << 32767.0 << true;
        QTest::newRow("picture shown at natural size") << "UserResoY" << -1.0 << false;
    }
    void layoutBounds()
    {
        QFETCH(QString, key);
        QFETCH(double, value);
        QFETCH(bool, refused);
        LabelData data;
        DirectLabelLayout& layout = directLabelLayout();
        const std::map<QString, std::function<void(double)>> set{
            {"PageRows", [&](double v) { layout.page.PageRows = short(v); }},
            {"PageCols", [&](double v) { layout.page.PageCols = short(v); }},
            {"LabTop", [&](double v) { layout.page.LabTop = short(v); }},
            {"FontSize", [&](double v) { layout.lines[0].FontSize = uchar(v); }},
            {"Height", [&](double v) { layout.lines[0].Height = short(v); }},
            {"DimX", [&](double v) { layout.bar.DimX = float(v); }},
            {"BarHeight", [&](double v) { layout.bar.BarHeight = float(v); }},
            {"UserResoX", [&](double v) { layout.bar.UserResoX = short(v); }},
            {"UserResoY", [&](double v) { layout.bar.UserResoY = short(v); }},
        };
        const QString temp = work.filePath("bounds-" + key);
        QVERIFY(QDir().mkpath(temp + "/tgrlab"));
        writeFile(temp + "/tgrlab/tgrlab1.htm", "earlier page");

        const auto f = directCard(data, temp, "[LabelBar]\nBarType=2\n");
        layout.lines[0] = textLine(0, "ItemKey");
        layout.lines[1] = textLine(4, "BarCode");
        layout.lines[1].ViewType = 1;
        set.at(key)(value);
        f->c<QPushButton>("cmdPrintItmes")->click();

        QCOMPARE(f->pages->shown.size(), refused ? 0 : 1);
        QCOMPARE(f->prompt->criticalCount(), refused ? 1 : 0);
        if (refused) {
            QVERIFY2(f->prompt->lines().first().contains("(" + key + ")"), qPrintable(f->prompt->lines().first()));
            // Nothing of the job was started: the last job's page is as it was, no picture made.
            QCOMPARE(readFile(temp + "/tgrlab/tgrlab1.htm"), QByteArray("earlier page"));
            QCOMPARE(QDir(temp + "/tgrlab").entryList(QDir::Files), QStringList{"tgrlab1.htm"});
            // A host's page is refused the same way.
            QVERIFY(CreateLabPage(work.filePath("bounds.htm"), data.docs, "SELECT 1 AS Copies", layout, "0.00", nullptr)
                        .contains("(" + key + ")"));
        }
    }

    // A page that fails after its head leaves nothing of itself behind; an
    // earlier page at that name stays as it was.
    void failedPageLeavesNothing_data()
    {
        QTest::addColumn<QString>("db");
        QTest::addColumn<QString>("sql");
        QTest::newRow("no database") << "missing.tmp" << "SELECT 1 AS Copies";
        QTest::newRow("query fails") << "" << "SELECT NoSuchColumn FROM tItems";
    }
    void failedPageLeavesNothing()
    {
        QFETCH(QString, db);
        QFETCH(QString, sql);
        LabelData data;
        QTemporaryDir out;
        const QString file = out.filePath("tgrlab1.htm");
        writeFile(file, "earlier page");
        DirectLabelLayout layout;
        layout.lines[0] = textLine(0, "ItemKey");
        const QString error
            = CreateLabPage(file, db.isEmpty() ? data.docs : out.filePath(db), sql, layout, "0.00", nullptr);
        QVERIFY(!error.isEmpty());
        QCOMPARE(QDir(out.path()).entryList(QDir::Files | QDir::Hidden), QStringList{"tgrlab1.htm"});
        QCOMPARE(readFile(file), QByteArray("earlier page"));
    }

    // A job folder planted by someone else is refused as it stands: a link to
    // another folder, a folder others may write to. The print stops with the
    // reason, and what the link points at is left whole.
    void plantedJobFolderRefused_data()
    {
        QTest::addColumn<QString>("planted");
        QTest::addColumn<QString>("reason");
        QTest::newRow("link to a folder") << "link" << "קישור";
        QTest::newRow("others may write") << "open" << "פתוחה לכתיבה";
        QTest::newRow("a file") << "file" << "אינו תיקייה";
    }
    void plantedJobFolderRefused()
    {
        QFETCH(QString, planted);
        QFETCH(QString, reason);
        LabelData data;
        QTemporaryDir temp;
        const QString folder = temp.filePath("tgrlab");
        const QString other = temp.filePath("other");
        QVERIFY(QDir().mkpath(other));
        writeFile(other + "/tgrlab1.htm", "someone's page");
        writeFile(other + "/B0400001.BMP", "someone's picture");
        if (planted == "link")
            QVERIFY(QFile::link(other, folder));
        else if (planted == "open")
            QVERIFY(QDir().mkpath(folder) && QFile::setPermissions(folder, QFile::Permissions(0x7777)));
        else
            writeFile(folder, "a file");
        const auto f = directCard(data, temp.path(), barcodeIni);
        f->c<QPushButton>("cmdPrintItmes")->click();
        QCOMPARE(f->prompt->criticalCount(), 1);
        QVERIFY2(f->prompt->lines().join('\n').contains(reason), qPrintable(f->prompt->lines().join('\n')));
        QVERIFY(f->pages->shown.isEmpty());
        QCOMPARE(QDir(other).entryList(QDir::Files), QStringList({"B0400001.BMP", "tgrlab1.htm"}));
        QCOMPARE(readFile(other + "/tgrlab1.htm"), QByteArray("someone's page"));
        QCOMPARE(readFile(other + "/B0400001.BMP"), QByteArray("someone's picture"));
    }

    // A job removes only what jobs make (the page, the pictures by their
    // names): other files stay, a folder is not entered, and a link under a
    // picture's name goes as a link while the file it names stays. A roll
    // takes the items last to first: B1 (no barcode), A2, A1.
    void foreignFilesSurviveJob()
    {
        LabelData data;
        QTemporaryDir temp;
        const QString folder = temp.filePath("tgrlab");
        QVERIFY(QDir().mkpath(folder + "/keep"));
        writeFile(folder + "/notes.txt", "notes");
        writeFile(folder + "/B04.BMP", "not a picture name");
        writeFile(folder + "/keep/tgrlab1.htm", "kept page");
        writeFile(folder + "/keep/B0400001.BMP", "kept picture");
        writeFile(folder + "/B0400009.BMP", "old picture");
        writeFile(folder + "/tgrlab-001.pdf", "an earlier bridge's labels");
        writeFile(folder + "/tgrlab-7.pdf", "not a name of ours");
        writeFile(temp.filePath("outside.txt"), "outside");
        QVERIFY(QFile::link(temp.filePath("outside.txt"), folder + "/B0400008.BMP"));
        const auto f = directCard(data, temp.path(), barcodeIni);
        f->c<QPushButton>("cmdPrintItmes")->click();
        QVERIFY2(f->prompt->lines().isEmpty(), qPrintable(f->prompt->lines().join('\n')));
        QCOMPARE(f->pages->shown, QStringList{folder + "/tgrlab1.htm"});
        QVERIFY(f->c<QCheckBox>("ChkFldSend(4)")->isChecked());
        QCOMPARE(QDir(folder).entryList(QDir::Files | QDir::System, QDir::Name),
                 QStringList({"B04.BMP", "B0400002.BMP", "B0400003.BMP", "notes.txt", "tgrlab-7.pdf", "tgrlab1.htm"}));
        QCOMPARE(readFile(folder + "/notes.txt"), QByteArray("notes"));
        QCOMPARE(readFile(folder + "/keep/tgrlab1.htm"), QByteArray("kept page"));
        QCOMPARE(readFile(folder + "/keep/B0400001.BMP"), QByteArray("kept picture"));
        QCOMPARE(readFile(temp.filePath("outside.txt")), QByteArray("outside"));
    }

    // Without "Temp" the job goes to a folder of the user's own, made private.
    void privateJobFolder_data()
    {
        QTest::addColumn<bool>("runtime");
        QTest::newRow("runtime folder") << true;
        QTest::newRow("cache folder") << false;
    }
    void privateJobFolder()
    {
        QFETCH(bool, runtime);
        LabelData data;
        QTemporaryDir home;
        qputenv("XDG_RUNTIME_DIR", runtime ? home.path().toUtf8() : QByteArray());
        qputenv("XDG_CACHE_HOME", home.filePath("cache").toUtf8());
        const QString folder = runtime ? home.filePath("tgrlab") : home.filePath("cache/tagora/tgrlab");
        QCOMPARE(directJobFolder(), folder);
        CardFixture f("[GeneralParams]\nDBPath=" + data.folder.toUtf8() + "\nOptOLE3=True\nOptOLE0=False\n" + barcodeIni);
        f.c<QPushButton>("cmdPrintItmes")->click();
        QVERIFY2(f.prompt->lines().isEmpty(), qPrintable(f.prompt->lines().join('\n')));
        QCOMPARE(f.pages->shown, QStringList{folder + "/tgrlab1.htm"});
        struct stat st {};
        QVERIFY(::lstat(QFile::encodeName(folder).constData(), &st) == 0);
        QCOMPARE(st.st_mode & 07777, mode_t(0700));
    }

    // Enough records that the pictures are drawn on several threads: refusals
    // still come in record order, every picture is the one a single handle
    // draws for its value, and a picture the disk will not take stops the job
    // at that record, with no picture after it.
    void picturesInRecordOrder_data()
    {
        QTest::addColumn<int>("items");
        QTest::addColumn<int>("refusedEvery"); // every n-th record holds a value Code 128 cannot carry; 0: none
        QTest::addColumn<int>("tooLargeAt");   // the record whose picture outgrows the disk; 0: none
        QTest::newRow("few records, one refused") << 5 << 2 << 0;
        QTest::newRow("many records, none refused") << 400 << 0 << 0;
        QTest::newRow("many records, refusals spread") << 400 << 7 << 0;
        QTest::newRow("disk full midway") << 400 << 7 << 250;
        QTest::newRow("disk full at the first record") << 400 << 0 << 1;
    }
    void picturesInRecordOrder()
    {
        QFETCH(int, items);
        QFETCH(int, refusedEvery);
        QFETCH(int, tooLargeAt);
        auto value = [&](int r) {
            if (r == tooLargeAt)
                return QStringLiteral("LONG-%1").arg(QString(40, QLatin1Char('X')));
            if (refusedEvery > 0 && r % refusedEvery == 0)
                return QStringLiteral("א-%1").arg(r);
            return QStringLiteral("TG-%1").arg(r, 7, 10, QLatin1Char('0'));
        };
        QStringList rows;
        for (int r = 1; r <= items; ++r)
            rows << QStringLiteral("('K%1', 'n', '%2', 'ILS', %3, 1)").arg(r, 4, 10, QLatin1Char('0')).arg(value(r)).arg(r % 3 + 1);
        LabelData data("DELETE FROM tItems; INSERT INTO tItems (ItemKey, ItemName, BarCode, Coin, Copies, PrintLabel) VALUES "
                       + rows.join(',') + ';');

        // A limit between an ordinary picture and the long one, measured, not guessed.
        const QString folder = work.filePath(QStringLiteral("order-%1-%2-%3").arg(items).arg(refusedEvery).arg(tooLargeAt));
        QVERIFY(QDir().mkpath(folder));
        LabelBarDef bar;
        bar.BarType = 2;
        auto reference = [&](const QString& v) {
            const QString file = folder + QStringLiteral("/reference.bmp");
            ZintBarcodeLibrary lib;
            LabelBarDef copy = bar;
            const int code = libraryBarType(copy.BarType, copy);
            const qint32 handle = lib.A1OpenInstance();
            QString error;
            const QByteArray bytes = DrawBarcode(v, file, copy, code, lib, handle, &error) ? readFile(file) : QByteArray();
            QFile::remove(file);
            return bytes;
        };
        const qint64 ordinary = reference(QStringLiteral("TG-0000001")).size();
        const qint64 large = reference(QStringLiteral("LONG-%1").arg(QString(40, QLatin1Char('X')))).size();
        QVERIFY2(ordinary > 0 && large > ordinary, qPrintable(QStringLiteral("%1 %2").arg(ordinary).arg(large)));
        const rlim_t limit = tooLargeAt > 0 ? rlim_t((ordinary + large) / 2) : RLIM_INFINITY;

        LabelQuerySettings q;
        q.sent[4] = true;
        const QString sql = BuildItemQuery(q, QueryByItems, OrderAscending);
        const LimitedRun run = runWithFileLimit(limit, [&] {
            ZintBarcodeLibrary lib;
            LabelBarDef working = bar;
            QVector<BarcodeRefusal> refused;
            const QString error = MakeBarcodeImages(folder, "BarCode", 4, data.docs, sql, working, lib, &refused);
            QStringList report{error};
            for (const BarcodeRefusal& r : refused)
                report << QStringLiteral("%1:%2:%3").arg(r.record).arg(r.labels).arg(r.data);
            report << QString::number(lib.openInstances());
            return report.join(QChar(0x1e)).toUtf8();
        });
        QVERIFY(run.exited);
        QStringList report = QString::fromUtf8(run.report).split(QChar(0x1e));
        QCOMPARE(report.takeLast(), QStringLiteral("0")); // every handle closed
        const QString error = report.takeFirst();
        QCOMPARE(error.contains(QString::fromUtf8("לא הודפסו מדבקות")), tooLargeAt > 0);

        const int stop = tooLargeAt > 0 ? tooLargeAt : items + 1;
        QStringList expectedRefusals;
        for (int r = 1; r <= items; ++r) {
            const bool refused = value(r).startsWith(QString::fromUtf8("א"));
            if (r < stop && refused)
                expectedRefusals << QStringLiteral("%1:%2:%3").arg(r).arg(r % 3 + 1).arg(value(r));
            const QString file = folder + '/' + BarcodeImageName(4, r);
            const bool made = r < stop && !refused;
            QVERIFY2(QFile::exists(file) == made, qPrintable(file));
            if (made)
                QVERIFY2(readFile(file) == reference(value(r)), qPrintable(file));
        }
        QCOMPARE(report, expectedRefusals);
    }

    // A host calling the method reads the outcome; the user sees the failure.
    void createLabFileTellsHost_data()
    {
        QTest::addColumn<bool>("goodDatabase");
        QTest::newRow("written") << true;
        QTest::newRow("failed") << false;
    }
    void createLabFileTellsHost()
    {
        QFETCH(bool, goodDatabase);
        LabelData data;
        CardFixture f;
        directLabelLayout().lines[0] = textLine(0, "ItemKey");
        const QString file = work.filePath(QStringLiteral("host%1.htm").arg(goodDatabase));
        bool result = !goodDatabase;
        QVERIFY(QMetaObject::invokeMethod(f.card.get(), "CreateLabFile", Q_RETURN_ARG(bool, result), Q_ARG(QString, file),
                                          Q_ARG(QString, goodDatabase ? data.docs : data.folder + "/missing.tmp"),
                                          Q_ARG(uchar, 1), Q_ARG(uchar, 1)));
        QCOMPARE(result, goodDatabase);
        QCOMPARE(f.prompt->criticalCount(), goodDatabase ? 0 : 1);
        QCOMPARE(QFile::exists(file), goodDatabase);
    }
};

QTEST_MAIN(TestDirectLabels)
#include "tst_directlabels.moc"
