#include "localdb/conversions.h"

#include <QtTest>

using namespace tagora;

class TestConversions : public QObject {
    Q_OBJECT
private slots:
    void parseDayMonthYear_data()
    {
        QTest::addColumn<QString>("text");
        QTest::addColumn<QDate>("date");
        QTest::newRow("short year 2000s") << "5/3/07" << QDate(2007, 3, 5);
        QTest::newRow("short year 1900s") << "05/03/98" << QDate(1998, 3, 5);
        QTest::newRow("window edge 80") << "1/1/80" << QDate(1980, 1, 1);
        QTest::newRow("window edge 79") << "1/1/79" << QDate(2079, 1, 1);
        QTest::newRow("full year") << "5/3/2007" << QDate(2007, 3, 5);
        QTest::newRow("day rolls over") << "31/02/05" << QDate(2005, 3, 3);
        QTest::newRow("month rolls over") << "1/13/05" << QDate(2006, 1, 1);
        QTest::newRow("two digit month") << "5/12/07" << QDate(2007, 12, 5);
        QTest::newRow("stored default") << "01/01/2025" << QDate(2025, 1, 1);
        QTest::newRow("one separator") << "5/3" << QDate();
        QTest::newRow("letters") << "aa/bb/cc" << QDate();
        QTest::newRow("empty part") << "5//07" << QDate();
        QTest::newRow("empty") << "" << QDate();
    }
    void parseDayMonthYear()
    {
        QFETCH(QString, text);
        QFETCH(QDate, date);
        const auto parsed = ParseDayMonthYear(text);
        QCOMPARE(parsed.has_value(), date.isValid());
        if (parsed)
            QCOMPARE(*parsed, date);
    }

    void quantityToCopies_data()
    {
        QTest::addColumn<double>("quantity");
        QTest::addColumn<int>("copies");
        QTest::newRow("half to even down") << 2.5 << 2;
        QTest::newRow("half to even up") << 3.5 << 4;
        QTest::newRow("negative") << -12.0 << 12;
        QTest::newRow("just under cap") << 999.4 << 999;
        QTest::newRow("cap") << 1000.0 << 999;
        QTest::newRow("negative cap") << -1000.0 << 999;
        QTest::newRow("zero") << 0.0 << 0;
        QTest::newRow("not a number") << std::nan("") << 999;
    }
    void quantityToCopies()
    {
        QFETCH(double, quantity);
        QFETCH(int, copies);
        QCOMPARE(int(QuantityToCopies(quantity)), copies);
    }

    void textHelpers()
    {
        QCOMPARE(StripQuoteChars(QVariant()), QString());
        QCOMPARE(StripQuoteChars(QString("a'b,c\"d")), QString("abcd"));
        QCOMPARE(StripQuoteChars(QString::fromUtf8("מק\"ט, 'חדש'")), QString::fromUtf8("מקט חדש"));
        QCOMPARE(NullToText(QVariant(), "?"), QString("?"));
        QCOMPARE(NullToText(QVariant(12), "?"), QString("12"));
    }
};

QTEST_GUILESS_MAIN(TestConversions)
#include "tst_conversions.moc"
