// The item list: the page the list buttons write and show.
#include "support/cardfixture.h"
#include "support/labeldata.h"

#include "labels/itemlist.h"

#include <QAbstractButton>
#include <QCheckBox>
#include <QDate>
#include <QLabel>
#include <QLineEdit>
#include <QStringDecoder>
#include <QtTest>

using namespace tagora;

namespace {
QByteArray readBytes(const QString& path)
{
    QFile f(path);
    return f.open(QIODevice::ReadOnly) ? f.readAll() : QByteArray();
}

// Rows of the label field table sent (ticked) or grey, by number.
using Ticks = QList<QPair<int, Qt::CheckState>>;
} // namespace

class TestItemList : public QObject {
    Q_OBJECT
    QTemporaryDir work;
    int runs = 0;

private slots:
    void cleanup() { qunsetenv("Temp"); }

    void cells_data()
    {
        QTest::addColumn<QVariant>("value");
        QTest::addColumn<QString>("kind");
        QTest::addColumn<QString>("expected");
        QTest::newRow("price") << QVariant(12) << "2" << "12.00";
        QTest::newRow("price as text") << QVariant("12.5") << "2" << "12.50";
        QTest::newRow("no price") << QVariant() << "2" << "";
        QTest::newRow("date as stored") << QVariant("2026-03-05 14:30:00") << "3" << "05/03/26";
        QTest::newRow("text that is no date") << QVariant("soon") << "3" << "soon";
        QTest::newRow("number as text") << QVariant(12) << "1" << "12";
        QTest::newRow("nothing") << QVariant() << "1" << "";
    }
    void cells()
    {
        QFETCH(QVariant, value);
        QFETCH(QString, kind);
        QFETCH(QString, expected);
        QCOMPARE(ItemListCell(value, kind, "0.00"), expected);
    }

    // The list as the items tab's button shows it, in the job folder.
    void listPage_data()
    {
        QTest::addColumn<QString>("sql");
        QTest::addColumn<Ticks>("ticks");
        QTest::addColumn<QString>("expression"); // of row 33, shown as a date
        QTest::addColumn<QStringList>("expected");
        QTest::addColumn<QStringList>("absent");
        const QString head = QString::fromUtf8("  <td class=TDCaption>");
        QTest::newRow("no record") << "UPDATE tItems SET PrintLabel = 0" << Ticks{{0, Qt::Checked}} << QString()
                                   << QStringList{} << QStringList{"<table", "<p ", "</BODY>"};
        QTest::newRow("price and copies")
            << "UPDATE tItems SET Price = 12 WHERE ItemKey = 'A1'" << Ticks{{0, Qt::Checked}, {6, Qt::Checked}}
            << QString()
            << QStringList{head + QString::fromUtf8("קוד פריט</td>\r\n") + head + QString::fromUtf8("מחיר</td>\r\n") + head
                               + QString::fromUtf8("עותקים</td>\r\n </tr>"),
                           " <tr>\r\n  <td>A1</td>\r\n  <td>12.00</td>\r\n  <td>2</td>\r\n </tr>",
                           "</table>\r\n</BODY>\r\n</HTML>\r\n"}
            << QStringList{"C9"};
        QTest::newRow("grey row sent") << QString() << Ticks{{0, Qt::Checked}, {1, Qt::PartiallyChecked}} << QString()
                                       << QStringList{head + QString::fromUtf8("שם פריט</td>"), "  <td>Bolt</td>"}
                                       << QStringList{head + QString::fromUtf8("מחיר</td>")};
        QTest::newRow("values as typed")
            << "UPDATE tItems SET ItemName = CASE ItemKey WHEN 'A1' THEN '<b>' WHEN 'A2' THEN 'A&B ''x''' ELSE 'snow ☃' END"
            << Ticks{{1, Qt::Checked}} << QString()
            << QStringList{"  <td>&lt;b&gt;</td>", "  <td>A&amp;B &#39;x&#39;</td>", "  <td>snow &#9731;</td>"}
            << QStringList{"<b>", "?"};
        QTest::newRow("date field") << QString() << Ticks{{33, Qt::Checked}} << "'2026-03-05 00:00:00'"
                                    << QStringList{"  <td>05/03/26</td>"} << QStringList{"2026"};
    }
    void listPage()
    {
        QFETCH(QString, sql);
        QFETCH(Ticks, ticks);
        QFETCH(QString, expression);
        QFETCH(QStringList, expected);
        QFETCH(QStringList, absent);
        LabelData data(sql.isEmpty() ? QString() : sql + ";");
        const QString temp = work.filePath(QStringLiteral("temp%1").arg(++runs));
        qputenv("Temp", temp.toUtf8());
        CardFixture f(QStringLiteral("[GeneralParams]\nDBPath=%1\n").arg(data.folder).toUtf8());
        for (const auto& [row, state] : ticks)
            f.c<QCheckBox>(QStringLiteral("ChkFldSend(%1)").arg(row))->setCheckState(state);
        if (!expression.isEmpty()) {
            f.c<QLineEdit>("txtFldExpr(33)")->setText(expression);
            f.c<QLabel>("LblFldName(33)")->setProperty("Tag", "3");
        }
        f.c<QAbstractButton>("cmdPreview(1)")->click();
        QVERIFY2(f.prompt->lines().isEmpty(), qPrintable(f.prompt->lines().join('\n')));
        const QString page = temp + "/tgrlab/tgrlab2.htm";
        QCOMPARE(f.pages->shown, QStringList{page});
        const QByteArray bytes = readBytes(page);
        const QString html = QStringDecoder("windows-1255").decode(bytes);
        QVERIFY(html.startsWith(QString::fromUtf8("<HTML>\r\n<HEAD>\r\n<TITLE>רשימת פריטים להדפסה</TITLE>\r\n")));
        QVERIFY(html.contains("<BODY BGCOLOR='#FFFFFF'>\r\n"));
        QCOMPARE(bytes.count("\r\n"), bytes.count('\n'));
        if (expected.isEmpty())
            QVERIFY(html.endsWith("<BODY BGCOLOR='#FFFFFF'>\r\n"));
        for (const QString& e : expected)
            QVERIFY2(html.contains(e), qPrintable(e + "\n---\n" + html));
        for (const QString& a : absent)
            QVERIFY2(!html.contains(a), qPrintable(a));
        QCOMPARE(QDir(temp + "/tgrlab").entryList(QDir::Files), QStringList{"tgrlab2.htm"});
    }

    // The list empties the job folder of an earlier job's files, and only of them.
    void showingClearsEarlierJob()
    {
        LabelData data;
        const QString temp = work.filePath("temp-earlier");
        const QString folder = temp + "/tgrlab";
        QVERIFY(QDir().mkpath(folder));
        QFile::setPermissions(folder, QFileDevice::ReadOwner | QFileDevice::WriteOwner | QFileDevice::ExeOwner);
        for (const QString& name : {"tgrlab1.htm", "B0400001.BMP", "B0100012.BMP", "notes.txt"}) {
            QFile file(folder + "/" + name);
            QVERIFY(file.open(QIODevice::WriteOnly) && file.write("earlier") > 0);
        }
        qputenv("Temp", temp.toUtf8());
        CardFixture f(QStringLiteral("[GeneralParams]\nDBPath=%1\n").arg(data.folder).toUtf8());
        f.c<QCheckBox>("ChkFldSend(0)")->setChecked(true);
        f.c<QAbstractButton>("cmdPreview(0)")->click();
        QVERIFY2(f.prompt->lines().isEmpty(), qPrintable(f.prompt->lines().join('\n')));
        QCOMPARE(QDir(folder).entryList(QDir::Files), QStringList({"notes.txt", "tgrlab2.htm"}));
        // Labels by documents: the lines of the included documents.
        QVERIFY(QString::fromLatin1(readBytes(folder + "/tgrlab2.htm")).contains("  <td>4</td>"));
    }

    // A failure opens no window, tells the user, and leaves the earlier list in place.
    void failureShowsFault()
    {
        LabelData data;
        const QString temp = work.filePath("temp-fault");
        qputenv("Temp", temp.toUtf8());
        CardFixture f(QStringLiteral("[GeneralParams]\nDBPath=%1\n").arg(data.folder).toUtf8());
        f.c<QCheckBox>("ChkFldSend(33)")->setChecked(true);
        f.c<QLineEdit>("txtFldExpr(33)")->setText("NoSuchColumn");
        f.c<QAbstractButton>("cmdPreview(1)")->click();
        QCOMPARE(f.prompt->criticalCount(), 1);
        QVERIFY2(f.prompt->lines().first().startsWith(QString::fromUtf8("תקלה")), qPrintable(f.prompt->lines().first()));
        QVERIFY(f.pages->shown.isEmpty());
        QVERIFY(!QFile::exists(temp + "/tgrlab/tgrlab2.htm"));
    }
};

QTEST_MAIN(TestItemList)
#include "tst_itemlist.moc"
