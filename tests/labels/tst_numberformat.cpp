#include "labels/numberformat.h"

#include <QtTest>
#include <limits>

using namespace tagora;

class TestNumberFormat : public QObject {
    Q_OBJECT
private slots:
    void format_data()
    {
        QTest::addColumn<QVariant>("value");
        QTest::addColumn<QString>("pattern");
        QTest::addColumn<QString>("text");
        QTest::newRow("two places") << QVariant(5) << "0.00" << "5.00";
        QTest::newRow("half away from zero") << QVariant(2.345) << "0.00" << "2.35";
        QTest::newRow("negative half") << QVariant(-2.345) << "0.00" << "-2.35";
        QTest::newRow("text number") << QVariant("12.5") << "0.00" << "12.50";
        QTest::newRow("grouping") << QVariant(1234567.891) << "#,##0.00" << "1,234,567.89";
        QTest::newRow("small grouped") << QVariant(12) << "#,##0.00" << "12.00";
        QTest::newRow("no integer digit") << QVariant(0.5) << "#.##" << ".5";
        QTest::newRow("carry") << QVariant(9.999) << "0.00" << "10.00";
        QTest::newRow("whole") << QVariant(7.5) << "0" << "8";
        QTest::newRow("literals") << QVariant(3) << "\"NIS \"0.00" << "NIS 3.00";
        QTest::newRow("percent") << QVariant(0.256) << "0%" << "26%";
        QTest::newRow("negative section") << QVariant(-4) << "0.00;(0.00)" << "(4.00)";
        QTest::newRow("zero section") << QVariant(0) << "0.00;(0.00);-" << "-";
        QTest::newRow("named standard") << QVariant(1000) << "Standard" << "1,000.00";
        QTest::newRow("null") << QVariant() << "0.00" << "";
        QTest::newRow("not a number") << QVariant("N/A") << "0.00" << "N/A";
        QTest::newRow("binary fraction") << QVariant(1.005) << "0.00" << "1.01";
        // Values of every type a query hands back, and patterns of every
        // shape, as the formatter has always written them.
        QTest::newRow("integer column") << QVariant(qlonglong(1234567)) << "#,##0.00" << "1,234,567.00";
        QTest::newRow("integer beyond doubles") << QVariant(qlonglong(9007199254740993LL)) << "0" << "9007199254740992";
        QTest::newRow("unsigned") << QVariant(uint(42)) << "0.0" << "42.0";
        QTest::newRow("price column") << QVariant(12345 * 1.25) << "#,##0.00" << "15,431.25";
        QTest::newRow("shortest form kept") << QVariant(0.1 + 0.2) << "0.000000000000000000" << "0.300000000000000000";
        QTest::newRow("negative zero") << QVariant(-0.0) << "0.00" << "0.00";
        QTest::newRow("negative rounding to zero") << QVariant(-0.004) << "0.00" << "0.00";
        QTest::newRow("negative rounding to zero, sections") << QVariant(-0.004) << "0.00;(0.00);\"zero\"" << "(0.00)";
        QTest::newRow("empty zero section") << QVariant(0.0) << "0.00;(0.00);" << "0.00";
        QTest::newRow("empty negative section") << QVariant(-3.5) << "0.00;;-" << "-3.50";
        QTest::newRow("quoted semicolon") << QVariant(2.5) << "\"a;b\"0.0" << "a;b2.5";
        QTest::newRow("escaped semicolon") << QVariant(2.5) << "0.0\\;" << "2.5;";
        QTest::newRow("no placeholders") << QVariant(7) << "\"n/a\"" << "n/a";
        QTest::newRow("general number") << QVariant(1.0 / 3) << "General Number" << "0.333333333333333";
        QTest::newRow("empty pattern") << QVariant(2.5) << "" << "2.5";
        QTest::newRow("named fixed, negative") << QVariant(qlonglong(-12)) << "Fixed" << "-12.00";
        QTest::newRow("named percent") << QVariant(0.12345) << "Percent" << "12.35%";
        QTest::newRow("beyond 15 digits") << QVariant(1e17) << "#,##0.00" << "100,000,000,000,000,000.00";
        QTest::newRow("text with spaces") << QVariant(" 3.456 ") << "0.00" << "3.46";
        QTest::newRow("boolean") << QVariant(true) << "0.00" << "true";
        QTest::newRow("infinity") << QVariant(std::numeric_limits<double>::infinity()) << "0.00" << "inf";
        QTest::newRow("not a number double") << QVariant(std::numeric_limits<double>::quiet_NaN()) << "0.00" << "nan";
        QTest::newRow("infinity as text") << QVariant("inf") << "0.00" << "inf";
        QTest::newRow("single precision") << QVariant(float(0.1f)) << "0.0000000000" << "0.1000000015";
        QTest::newRow("hex text") << QVariant("0x10") << "0.00" << "0x10";
        QTest::newRow("zero, optional digits") << QVariant(0) << "#,##0.##" << "0.";
    }
    void format()
    {
        QFETCH(QVariant, value);
        QFETCH(QString, pattern);
        QFETCH(QString, text);
        QCOMPARE(FormatNumber(value, pattern), text);
    }

    // Patterns used one after another, as a run's fields alternate them:
    // each value is written by its own pattern, not the one before.
    void patternsInTurn_data()
    {
        QTest::addColumn<QStringList>("patterns");
        QTest::addColumn<QStringList>("texts");
        QTest::newRow("four patterns") << QStringList{"0.00", "#,##0.00", "0.00;(0.00);-", "0%"}
                                       << QStringList{"-3.38|-3.38|(3.38)|-338%", "-2.25|-2.25|(2.25)|-225%",
                                                      "-1.13|-1.13|(1.13)|-113%", "0.00|0.00|-|0%",
                                                      "1.13|1.13|1.13|113%", "2.25|2.25|2.25|225%",
                                                      "3.38|3.38|3.38|338%"};
    }
    void patternsInTurn()
    {
        QFETCH(QStringList, patterns);
        QFETCH(QStringList, texts);
        for (int i = -3; i < 4; ++i) {
            QStringList out;
            for (const QString& p : patterns)
                out << FormatNumber(QVariant(i * 1.125), p);
            QCOMPARE(out.join('|'), texts[i + 3]);
        }
    }
};

QTEST_GUILESS_MAIN(TestNumberFormat)
#include "tst_numberformat.moc"
