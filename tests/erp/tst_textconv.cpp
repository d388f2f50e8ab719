#include "erp/connparams.h"
#include "erp/odbc.h"
#include "erp/textconv.h"

#include <QtTest>

using namespace tagora;

namespace {
// Writes a text given as its characters in reading order (א = alef ...).
QString chars(const char* utf8)
{
    return QString::fromUtf8(utf8);
}
const QChar S = kCellSeparator;
} // namespace

class TestTextConv : public QObject {
    Q_OBJECT
private slots:
    void init() { setErpConnType(1); }

    void visualToLogical_data()
    {
        QTest::addColumn<QString>("visual");
        QTest::addColumn<QString>("logical");
        QTest::newRow("hebrew then digits") << chars("םולש 123") << chars("123 שלום");
        QTest::newRow("run with joiner and brackets") << chars("ב(12-34)א") << chars("א(12-34)ב");
        QTest::newRow("joiner without run") << chars("-א") << chars("א-");
        QTest::newRow("latin word keeps order") << chars("םוקמ ABC") << chars("ABC מקום");
        QTest::newRow("decimal number") << chars("ח\"ש 12.50") << chars("12.50 ש\"ח");
        QTest::newRow("empty") << QString() << QString();
        // A character beyond the basic plane moves whole.
        QTest::newRow("emoji") << chars("םולש 😀") << chars("😀 שלום");
        QTest::newRow("math letter after a run") << chars("AB𝐀 א") << chars("א 𝐀AB");
    }
    void visualToLogical()
    {
        QFETCH(QString, visual);
        QFETCH(QString, logical);
        QCOMPARE(VisualToLogical(visual, 1), logical);
        QCOMPARE(VisualToLogical(visual, 0), logical);
        QCOMPARE(VisualToLogical(visual, 2), visual);
    }

    void convertErpText_data()
    {
        QTest::addColumn<int>("type");
        QTest::addColumn<QVariant>("value");
        QTest::addColumn<QString>("expected");
        QTest::newRow("null gives default") << 1 << QVariant() << "?";
        QTest::newRow("empty gives default") << 2 << QVariant(QString()) << "?";
        QTest::newRow("no hebrew unchanged") << 1 << QVariant(QString("(A1) [x]")) << "(A1) [x]";
        QTest::newRow("type 1 converted") << 1 << QVariant(chars("םולש")) << chars("שלום");
        QTest::newRow("type 0 like type 1") << 0 << QVariant(chars("םולש")) << chars("שלום");
        QTest::newRow("type 2 as it comes") << 2 << QVariant(chars("שלום")) << chars("שלום");
        QTest::newRow("number") << 1 << QVariant(12) << "12";
    }
    void convertErpText()
    {
        QFETCH(int, type);
        QFETCH(QVariant, value);
        QFETCH(QString, expected);
        setErpConnType(short(type));
        QCOMPARE(ConvertErpText(value, "?"), expected);
    }

    void reverseForCells_data()
    {
        QTest::addColumn<int>("type");
        QTest::addColumn<QString>("text");
        QTest::addColumn<QString>("cells");
        QTest::newRow("type 1") << 1 << chars("אב") << QString(S) + chars("ב") + S + chars("א") + S;
        QTest::newRow("type 2") << 2 << chars("אב") << QString(S) + chars("א") + S + chars("ב") + S;
        QTest::newRow("mirrored") << 1 << QString("(<") << QString(S) + '>' + S + ')' + S;
        QTest::newRow("type 2 keeps mirror") << 2 << QString("(<") << QString(S) + ')' + S + '>' + S;
        QTest::newRow("empty") << 1 << QString() << QString(S);
        QTest::newRow("type 1, emoji whole") << 1 << chars("א😀") << QString(S) + chars("😀") + S + chars("א") + S;
        QTest::newRow("type 2, math letter whole") << 2 << chars("𝐀(") << QString(S) + chars("𝐀") + S + ')' + S;
    }
    void reverseForCells()
    {
        QFETCH(int, type);
        QFETCH(QString, text);
        QFETCH(QString, cells);
        QCOMPARE(ReverseForCells(text, short(type)), cells);
        // A separator before each character and one at the end.
        QCOMPARE(cells.size(), text.size() + CharCount(text) + 1);
    }

    void hebrewLetters_data()
    {
        QTest::addColumn<QString>("text");
        QTest::addColumn<bool>("hebrew");
        QTest::newRow("alef") << chars("א") << true;
        QTest::newRow("tav") << chars("ת") << true;
        QTest::newRow("final letters") << chars("ךםןףץ") << true;
        QTest::newRow("points only") << chars("\u05B0\u05B4") << false;
        QTest::newRow("cell separator") << QString(S) << false;
        QTest::newRow("latin") << QString("abc") << false;
    }
    void hebrewLetters()
    {
        QFETCH(QString, text);
        QFETCH(bool, hebrew);
        QCOMPARE(HasHebrewLetters(text), hebrew);
    }

    void erpDates_data()
    {
        QTest::addColumn<int>("type");
        QTest::addColumn<QVariant>("erp");
        QTest::addColumn<QVariant>("date");
        QTest::newRow("epoch") << 2 << QVariant(0) << QVariant(QDateTime(QDate(1988, 1, 1), QTime(0, 0)));
        QTest::newRow("one day") << 2 << QVariant(1440) << QVariant(QDateTime(QDate(1988, 1, 2), QTime(0, 0)));
        QTest::newRow("with time") << 2 << QVariant(1440 * 10 + 90) << QVariant(QDateTime(QDate(1988, 1, 11), QTime(1, 30)));
        QTest::newRow("null") << 2 << QVariant() << QVariant();
        QTest::newRow("type 1 unchanged") << 1 << QVariant(QDate(2024, 3, 5)) << QVariant(QDate(2024, 3, 5));
    }
    void erpDates()
    {
        QFETCH(int, type);
        QFETCH(QVariant, erp);
        QFETCH(QVariant, date);
        QCOMPARE(ErpToDate(erp, short(type)), date);
    }

    void dateToErp_data()
    {
        QTest::addColumn<int>("type");
        QTest::addColumn<QVariant>("date");
        QTest::addColumn<QString>("literal");
        QTest::newRow("minutes") << 2 << QVariant(QDate(1988, 1, 2)) << "1440";
        QTest::newRow("afternoon moves to next day") << 2 << QVariant(QDateTime(QDate(1988, 1, 2), QTime(13, 0))) << "2880";
        QTest::newRow("morning stays") << 2 << QVariant(QDateTime(QDate(1988, 1, 2), QTime(9, 0))) << "1440";
        QTest::newRow("hash literal") << 1 << QVariant(QDate(2024, 3, 5)) << "#05/03/2024#";
        QTest::newRow("null") << 2 << QVariant() << "";
    }
    void dateToErp()
    {
        QFETCH(int, type);
        QFETCH(QVariant, date);
        QFETCH(QString, literal);
        QCOMPARE(DateToErpLiteral(date, short(type)), literal);
    }

    // Blanks go, at both ends only; other white space is part of the value.
    void nullTrim_data()
    {
        QTest::addColumn<QVariant>("value");
        QTest::addColumn<QString>("trimmed");
        QTest::newRow("null") << QVariant() << "";
        QTest::newRow("blanks at both ends") << QVariant("  a b  ") << "a b";
        QTest::newRow("only blanks") << QVariant("   ") << "";
        QTest::newRow("tab kept") << QVariant("\tA1 ") << "\tA1";
        QTest::newRow("line break kept") << QVariant(" A1\r\n") << "A1\r\n";
        QTest::newRow("no-break space kept") << QVariant(QString(" A1") + QChar(0x00A0)) << QString("A1") + QChar(0x00A0);
        QTest::newRow("blank inside a tab") << QVariant(" \t ") << "\t";
        QTest::newRow("number") << QVariant(12) << "12";
    }
    void nullTrim()
    {
        QFETCH(QVariant, value);
        QFETCH(QString, trimmed);
        QCOMPARE(NullTrim(value), trimmed);
    }

    void nullHelpers()
    {
        QCOMPARE(NullToDouble(QString("x")), 0.0);
        QCOMPARE(NullToDouble(QString(" 2.5 ")), 2.5);
        QCOMPARE(NullToInteger(QVariant()), short(0));
    }

    void connString_data()
    {
        QTest::addColumn<QVariant>("pwdValue");
        QTest::addColumn<int>("type");
        QTest::addColumn<QString>("expected");
        QTest::newRow("plain") << QVariant("secret") << 1 << "DSN=erp;Uid=sa;pwd=secret";
        QTest::newRow("null password") << QVariant() << 2 << "DSN=erp;Uid=sa;pwd=";
        QTest::newRow("semicolon quoted") << QVariant("a;b") << 2 << "DSN=erp;Uid=sa;pwd={a;b}";
        QTest::newRow("brace doubled") << QVariant("x}y") << 2 << "DSN=erp;Uid=sa;pwd={x}}y}";
        QTest::newRow("unknown type") << QVariant("x") << 3 << "";
    }
    void connString()
    {
        QFETCH(QVariant, pwdValue);
        QFETCH(int, type);
        QFETCH(QString, expected);
        erpDialect() = ErpDialect{};
        BuildConnString("erp", "sa", QVariant("warm"), "db", 2);
        QCOMPARE(erpDialect().likeWildcard, QString("%"));
        QCOMPARE(BuildConnString("erp", "sa", pwdValue, "db", short(type)), expected);
        // An unknown type leaves the dialect of the last good one.
        const bool typeTwo = type != 1;
        QCOMPARE(erpDialect().likeWildcard, typeTwo ? QString("%") : QString("*"));
        QCOMPARE(erpDialect().dateDelimiter, typeTwo ? QString("'") : QString("#"));
    }

    // SQLite stands in for the ERP's server; only its missing literal forms
    // change, and a column compared with a date value is taken to its day.
    void sqliteRewrite_data()
    {
        QTest::addColumn<QString>("sql");
        QTest::addColumn<QVariantList>("values");
        QTest::addColumn<QString>("sent");
        const QVariantList none;
        QTest::newRow("unicode literal") << "WHERE A = N'שלום'" << none << "WHERE A = 'שלום'";
        // A stored time must not put a date after the literal of its own day.
        QTest::newRow("date literal, column by its day")
            << "T.D >= #05/03/2024# AND D<=#5/3/2024#" << none << "date(T.D) >= '2024-03-05' AND date(D)<='2024-03-05'";
        QTest::newRow("column after the literal") << "WHERE #05/03/2024# <> T.D" << none << "WHERE '2024-03-05' <> date(T.D)";
        QTest::newRow("no column to compare") << "SELECT #05/03/2024#, f(X) >= #05/03/2024#" << none
                                              << "SELECT '2024-03-05', f(X) >= '2024-03-05'";
        QTest::newRow("function after the literal") << "#05/03/2024# = f(X)" << none << "'2024-03-05' = f(X)";
        QTest::newRow("end of a case") << "CASE WHEN A THEN D END >= #05/03/2024#" << none
                                       << "CASE WHEN A THEN D END >= '2024-03-05'";
        QTest::newRow("inside a string untouched") << "WHERE A = 'N''#05/03/2024#'" << none << "WHERE A = 'N''#05/03/2024#'";
        QTest::newRow("identifier ending in N") << "SELECT PARTN'x'" << none << "SELECT PARTN'x'";
        QTest::newRow("plain") << "SELECT 1" << none << "SELECT 1";
        // Only the markers whose values are dates touch their columns; a
        // question mark inside a string is no marker.
        QTest::newRow("date values among others")
            << "WHERE A = ? AND T.D >= ? AND B = '?' AND ? <= T.E AND C = ?"
            << QVariantList{QString("x"), QDate(2024, 3, 5), QDateTime(QDate(2024, 3, 5), QTime(8, 0)), 7}
            << "WHERE A = ? AND date(T.D) >= ? AND B = '?' AND ? <= date(T.E) AND C = ?";
        QTest::newRow("minutes are no date") << "WHERE T.D >= ?" << QVariantList{19353600} << "WHERE T.D >= ?";
    }
    void sqliteRewrite()
    {
        QFETCH(QString, sql);
        QFETCH(QVariantList, values);
        QFETCH(QString, sent);
        QCOMPARE(ErpConnection::rewriteForSqlite(sql, values), sent);
    }
};

QTEST_GUILESS_MAIN(TestTextConv)
#include "tst_textconv.moc"
