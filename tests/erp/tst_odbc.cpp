// Reading values through the ODBC layer the way the readers do, with the
// SQLite ODBC driver standing in for the ERP's server.
#include "support/erpfixture.h"

#include "erp/odbc.h"
#include "localdb/database.h"

#include <QtTest>

using namespace tagora;

namespace {
// Hebrew, Latin letters and digits, cut to length.
QString longText(int length)
{
    const QString piece = QString::fromUtf8("שורת תאור ארוכה 123 ABC (מידה 20 מ\"מ) ");
    QString t;
    while (t.size() < length)
        t += piece;
    t.truncate(length);
    return t;
}
} // namespace

class TestOdbc : public QObject {
    Q_OBJECT
    OdbcSandbox odbc;
    QString erpPath;

private slots:
    void initTestCase()
    {
        erpPath = odbc.dir.filePath(QStringLiteral("texts.sqlite"));
        Database db;
        QVERIFY(!db.open(erpPath, Database::OpenMode::Create));
        // A declared width is no limit in SQLite, so a VARCHAR column carries long text as well.
        QVERIFY(!db.exec(QStringLiteral("CREATE TABLE TEXTS (ID INTEGER PRIMARY KEY, LONGDES TEXT, SHORTDES VARCHAR(16))")));
        odbc.addDsn(QStringLiteral("TagoraTexts"), {{QStringLiteral("Driver"), QStringLiteral("SQLite3")},
                                                    {QStringLiteral("Database"), erpPath}});
    }

    // The reader takes a long value in pieces of 1,023 characters; joined, they
    // must give the stored text exactly, whatever falls on a seam.
    void longValues_data()
    {
        QTest::addColumn<QString>("text");
        QTest::newRow("1,023 characters") << longText(1023);
        QTest::newRow("1,024 characters") << longText(1024);
        QTest::newRow("5,000 characters") << longText(5000);
        QTest::newRow("no-break mark opening the second piece")
            << longText(1023) + QChar(0xFEFF) + longText(200);
        QTest::newRow("character beyond 16 bits across the seam")
            << longText(1022) + QString::fromUtf8("\xF0\x9F\x98\x80") + longText(1500);
        QTest::newRow("empty") << QString("");
        QTest::newRow("null") << QString();
    }
    void longValues()
    {
        QFETCH(QString, text);
        {
            Database db;
            QVERIFY(!db.open(erpPath));
            QVERIFY(!db.exec(QStringLiteral("DELETE FROM TEXTS")));
            Statement insert = db.prepare(QStringLiteral("INSERT INTO TEXTS (ID, LONGDES, SHORTDES) VALUES (1, ?1, ?1)"));
            insert.bind(1, text.isNull() ? QVariant() : QVariant(text));
            QVERIFY(!insert.run());
        }
        ErpConnection erp;
        QString error;
        QVERIFY2(erp.open(QStringLiteral("DSN=TagoraTexts"), 30, &error), qPrintable(error));
        auto rs = erp.query(QStringLiteral("SELECT ID, LONGDES, SHORTDES FROM TEXTS"), &error);
        QVERIFY2(rs, qPrintable(error));
        QVERIFY2(rs->next(), qPrintable(rs->error()));
        for (const char* column : {"LONGDES", "SHORTDES"}) {
            const QVariant value = rs->value(QLatin1String(column));
            QCOMPARE(value.isNull(), text.isNull());
            QCOMPARE(value.toString().size(), text.size());
            QCOMPARE(value.toString(), text);
        }
        QVERIFY(!rs->next());
        QVERIFY(!rs->failed());
    }

    // A value bound to a marker reaches the SQLite driver whole, as wide
    // text: it finds its own row and nothing else, and the table is untouched.
    void boundValues_data()
    {
        QTest::addColumn<QString>("stored");
        QTest::addColumn<QString>("where");
        QTest::addColumn<QVariant>("value");
        QTest::addColumn<bool>("found");
        const auto text = [](const QString& t) { return QVariant(t); };
        for (const QString& t : {QString::fromUtf8("בורג M6 (נירוסטה) 20 מ\"מ"), QString("\\'; DELETE FROM TEXTS; --"),
                                 QString("O'R-5 \\\\ ''"), QString::fromUtf8("\xF0\x9F\x98\x80 שלום"), longText(5000),
                                 QString("")})
            QTest::addRow("text %s", qPrintable(t.left(12))) << t << "LONGDES = ?" << text(t) << true;
        QTest::newRow("whole number") << "x" << "ID = ?" << QVariant(1) << true;
        QTest::newRow("64-bit number") << "x" << "ID = ?" << QVariant(qlonglong(1)) << true;
        QTest::newRow("decimal") << "x" << "ID < ?" << QVariant(1.5) << true;
        QTest::newRow("null matches nothing") << "x" << "LONGDES = ?" << QVariant() << false;
    }
    void boundValues()
    {
        QFETCH(QString, stored);
        QFETCH(QString, where);
        QFETCH(QVariant, value);
        QFETCH(bool, found);
        {
            Database db;
            QVERIFY(!db.open(erpPath));
            QVERIFY(!db.exec(QStringLiteral("DELETE FROM TEXTS; INSERT INTO TEXTS (ID, LONGDES) VALUES (2, 'other')")));
            Statement insert = db.prepare(QStringLiteral("INSERT INTO TEXTS (ID, LONGDES) VALUES (1, ?1)"));
            insert.bind(1, stored);
            QVERIFY(!insert.run());
        }
        ErpConnection erp;
        QString error;
        QVERIFY2(erp.open(QStringLiteral("DSN=TagoraTexts"), 30, &error), qPrintable(error));
        auto rs = erp.query(QStringLiteral("SELECT ID, LONGDES FROM TEXTS WHERE ") + where, {value}, &error);
        QVERIFY2(rs, qPrintable(error));
        QCOMPARE(rs->next(), found);
        if (found) {
            QCOMPARE(rs->value(0).toInt(), 1);
            QCOMPARE(rs->value(1).toString(), stored);
            QVERIFY(!rs->next());
        }
        QVERIFY(!rs->failed());
        rs.reset();
        QCOMPARE(erp.countRows(QStringLiteral("SELECT ID FROM TEXTS WHERE ") + where, {value}), found ? 1 : 0);
        QCOMPARE(erp.countRows(QStringLiteral("SELECT ID FROM TEXTS")), 2);
    }
};

QTEST_GUILESS_MAIN(TestOdbc)
#include "tst_odbc.moc"
