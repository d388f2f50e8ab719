#include "labels/numberformat.h"

#include <QtTest>

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
    }
    void format()
    {
        QFETCH(QVariant, value);
        QFETCH(QString, pattern);
        QFETCH(QString, text);
        QCOMPARE(FormatNumber(value, pattern), text);
    }
};

QTEST_GUILESS_MAIN(TestNumberFormat)
#include "tst_numberformat.moc"
