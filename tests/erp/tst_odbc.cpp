// Reading values through the ODBC layer the way the readers do, with the
// SQLite ODBC driver standing in for the ERP's server.
#include "support/erpfixture.h"

#include "erp/connparams.h"
#include "erp/itemimport.h"
#include "erp/odbc.h"
#include "localdb/database.h"
#include "localdb/schema.h"

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
    QString partsPath;
    QString demoPath;
    const QString sqlite = QStringLiteral("SQLite3");

    // The PART rows as the file holds them, read past the ODBC layer.
    QString parts() const
    {
        Database db;
        return db.open(partsPath, Database::OpenMode::ReadOnly)
            ? QStringLiteral("unreadable")
            : db.scalar(QStringLiteral("SELECT group_concat(PARTNAME, ',') FROM PART")).toString();
    }

    // The witness library's trace file, removed, and named for the library to write.
    QString freshTrace() const
    {
        const QString trace = odbc.dir.filePath("trace.txt");
        QFile::remove(trace);
        qputenv("TAGORA_TRACE_FILE", trace.toUtf8());
        return trace;
    }

    // TEXTS holding row 1 with `value` in the given columns, and row 2 when asked.
    static void storeText(const QString& path, const QString& columns, const QVariant& value, bool other)
    {
        Database db;
        QVERIFY(!db.open(path));
        QVERIFY(!db.exec(other ? "DELETE FROM TEXTS; INSERT INTO TEXTS (ID, LONGDES) VALUES (2, 'other')" : "DELETE FROM TEXTS"));
        Statement insert = db.prepare(QStringLiteral("INSERT INTO TEXTS (ID, %1) VALUES (1, ?1%2)")
                                          .arg(columns, columns.contains(',') ? ", ?1" : ""));
        insert.bind(1, value);
        QVERIFY(!insert.run());
    }

private slots:
    void initTestCase()
    {
        erpPath = odbc.dir.filePath(QStringLiteral("texts.sqlite"));
        Database db;
        QVERIFY(!db.open(erpPath, Database::OpenMode::Create));
        // A declared width is no limit in SQLite, so a VARCHAR column carries long text as well.
        QVERIFY(!db.exec(QStringLiteral("CREATE TABLE TEXTS (ID INTEGER PRIMARY KEY, LONGDES TEXT, SHORTDES VARCHAR(16))")));
        odbc.addDsn("TagoraTexts", {{"Driver", sqlite}, {"Database", erpPath}});
        partsPath = odbc.dir.filePath(QStringLiteral("parts.sqlite"));
        Database parts;
        QVERIFY(!parts.open(partsPath, Database::OpenMode::Create));
        QVERIFY(!parts.exec("CREATE TABLE PART (PART INTEGER PRIMARY KEY, PARTNAME TEXT);"
                            "INSERT INTO PART VALUES (1, 'EL-1'), (2, 'EL-2')"));
        odbc.addDsn("TagoraParts", {{"Driver", sqlite}, {"Database", partsPath}});
        odbc.addDsn("TagoraGone", {{"Driver", sqlite}, {"Database", odbc.dir.filePath("gone.sqlite")}});
        demoPath = odbc.addDemo(QStringLiteral("TagoraDemo"), DemoOptions{});
    }

    // Only one statement that reads goes out; whatever else the text hides
    // is refused and the ERP's rows stay as they were.
    void writesRefused_data()
    {
        QTest::addColumn<QString>("sql");
        QTest::newRow("delete") << "DELETE FROM PART";
        QTest::newRow("delete after a common table") << "WITH x AS (SELECT 1) DELETE FROM PART";
        QTest::newRow("update after a common table") << "with x as (select 1) update PART set PARTNAME = 'x'";
        QTest::newRow("insert after a common table") << "WITH x AS (SELECT 1) INSERT INTO PART SELECT * FROM PART";
        QTest::newRow("second statement") << "SELECT 1; DELETE FROM PART";
        QTest::newRow("second statement after a literal ;") << "SELECT ';'; DELETE FROM PART";
        QTest::newRow("second statement after a comment") << "SELECT 1 /* ; */; DELETE FROM PART --";
        QTest::newRow("second statement after a quoted name") << "SELECT 1 AS \"a;\"; DELETE FROM PART";
        QTest::newRow("select into") << "SELECT * INTO PARTCOPY FROM PART";
        QTest::newRow("pragma") << "PRAGMA query_only = OFF";
        QTest::newRow("comment before a write") << "/* SELECT */ DELETE FROM PART";
        QTest::newRow("write in parentheses") << "(DELETE FROM PART)";
        QTest::newRow("backslash read two ways") << "SELECT 'a\\'; DELETE FROM PART; --'";
        QTest::newRow("comment inside a comment") << "SELECT 1 /* /* */ ; DELETE FROM PART; /* */";
        QTest::newRow("unclosed literal") << "SELECT 'a";
    }
    void writesRefused()
    {
        QFETCH(QString, sql);
        const QString before = parts();
        QString error;
        const auto erp = openErp("DSN=TagoraParts", &error);
        QVERIFY2(erp, qPrintable(error));
        QVERIFY(!erp->query(sql, &error));
        QVERIFY(error.contains(QStringLiteral("שאילתות קריאה")));
        QCOMPARE(erp->countRows(sql), -1LL);
        QCOMPARE(parts(), before);
    }

    // Keywords and ";" inside literals, quoted names and comments are text,
    // and a closing ";" ends the one statement.
    void readsAccepted_data()
    {
        QTest::addColumn<QString>("sql");
        QTest::newRow("closing semicolon") << "SELECT PARTNAME FROM PART ORDER BY PART;  -- done";
        QTest::newRow("keywords in literals and names")
            << "SELECT PARTNAME, 'DELETE; INTO' AS \"UPDATE;\", [INSERT] FROM (SELECT PARTNAME, 1 AS [INSERT] FROM PART)";
        QTest::newRow("common table then select") << "WITH x AS (SELECT PARTNAME FROM PART) SELECT * FROM x";
        QTest::newRow("comments") << "/* labels; DROP */ SELECT PARTNAME -- DELETE\n FROM PART";
    }
    void readsAccepted()
    {
        QFETCH(QString, sql);
        QString error;
        const auto erp = openErp("DSN=TagoraParts", &error);
        QVERIFY2(erp, qPrintable(error));
        QVERIFY2(erp->countRows(sql, &error) == 2, qPrintable(error));
        auto rs = erp->query(sql, &error);
        QVERIFY2(rs, qPrintable(error));
        int n = 0;
        while (rs->next())
            ++n;
        QVERIFY2(!rs->failed(), qPrintable(rs->error()));
        QCOMPARE(n, 2);
    }

    // Past the guard, the connection itself refuses writes.
    void sqliteSessionReadOnly()
    {
        QString error;
        const auto erp = openErp("DSN=TagoraParts", &error);
        QVERIFY2(erp, qPrintable(error));
        QCOMPARE(firstValue(*erp, "SELECT query_only FROM pragma_query_only", &error).toLongLong(), 1LL);
    }

    // A data source whose file is missing is reported as missing, and the
    // driver is not left to create an empty ERP in its place.
    void missingFileReported()
    {
        const QString gone = odbc.dir.filePath("gone.sqlite");
        QString error;
        QVERIFY(!openErp(BuildConnString("TagoraGone", "sa", QVariant(), "", 2), &error));
        QVERIFY2(error.contains(QStringLiteral("לא נמצא")) && error.contains(gone), qPrintable(error));
        QVERIFY(!QFileInfo::exists(gone));
    }

    // The SQLite driver reads no braces: a value that would need them is
    // refused before connecting, so no key hidden in it takes effect. A data
    // source added while the program runs is judged by its own driver, not by
    // what was read of the ODBC files before.
    void unsafeValuesRefused_data()
    {
        QTest::addColumn<QString>("dsn");
        QTest::addColumn<QString>("uid");
        QTest::addColumn<QString>("pwd");
        QTest::addColumn<QString>("field");
        const QString ext = QStringLiteral(TAGORA_TRACE_EXT);
        QTest::newRow("library in the password") << "TagoraTexts" << "sa" << "x;LoadExt=" + ext + ";" << "הסיסמה";
        QTest::newRow("other database in the user") << "TagoraTexts" << "sa;Database=" + partsPath << "" << "שם המשתמש";
        QTest::newRow("brace in the password") << "TagoraTexts" << "sa" << "a}b{" << "הסיסמה";
        QTest::newRow("blank at the end of the user") << "TagoraTexts" << "sa " << "" << "שם המשתמש";
        QTest::newRow("source added while running") << "TagoraLate" << "sa" << "x;LoadExt=" + ext << "הסיסמה";
    }
    void unsafeValuesRefused()
    {
        QFETCH(QString, dsn);
        QFETCH(QString, uid);
        QFETCH(QString, pwd);
        QFETCH(QString, field);
        if (dsn == "TagoraLate")
            odbc.addDsn(dsn, {{"Driver", sqlite}, {"Database", erpPath}});
        const QString trace = freshTrace();
        const QString before = parts();
        QString error;
        QVERIFY(!openErp(BuildConnString(dsn, uid, pwd, "", 2), &error, 10));
        QVERIFY2(error.startsWith(field), qPrintable(error));
        QVERIFY(!QFileInfo::exists(trace));
        QCOMPARE(parts(), before);
    }

    // The witness works: a text that names the library as a key of its own
    // (as a host may write it) does load it.
    void traceLibraryLoads()
    {
        const QString trace = freshTrace();
        QString error;
        openErp(QStringLiteral("DSN=TagoraTexts;LoadExt=") + QStringLiteral(TAGORA_TRACE_EXT), &error, 10);
        QVERIFY(QFileInfo::exists(trace));
    }

    // A file locked by another program: the check and a reader end within
    // their own time-out with the driver's message.
    void lockedFileEndsWithMessage()
    {
        Database holder;
        QVERIFY(!holder.open(demoPath));
        QVERIFY(!holder.exec("BEGIN EXCLUSIVE; UPDATE PART SET PARTNAME = PARTNAME WHERE 0"));

        QString error;
        QVERIFY(!openErp("DSN=TagoraDemo", &error, 1));
        QVERIFY2(error.contains(QStringLiteral("locked")), qPrintable(error));

        const QString items = odbc.dir.filePath("items.tdb");
        DbError de;
        QVERIFY2(!CreateItemsDB(items, &de).isEmpty(), qPrintable(de.message));
        ErpReadContext ctx{QStringLiteral("DSN=TagoraDemo")};
        ctx.timeout = 1;
        ReadError re;
        QVERIFY(!ReadItemPriority(ctx, items, {}, {}, false, 1, 1, false, false, &re));
        QVERIFY2(re.message.contains(QStringLiteral("locked")), qPrintable(re.message));
        QVERIFY(!holder.exec(QStringLiteral("ROLLBACK")));
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
        storeText(erpPath, "LONGDES, SHORTDES", text.isNull() ? QVariant() : QVariant(text), false);
        QString error;
        const auto erp = openErp("DSN=TagoraTexts", &error);
        QVERIFY2(erp, qPrintable(error));
        auto rs = erp->query(QStringLiteral("SELECT ID, LONGDES, SHORTDES FROM TEXTS"), &error);
        QVERIFY2(rs, qPrintable(error));
        QVERIFY2(rs->next(), qPrintable(rs->error()));
        for (const char* column : {"LONGDES", "SHORTDES"}) {
            const QVariant value = rs->value(QLatin1String(column));
            QCOMPARE(value.isNull(), text.isNull());
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
        storeText(erpPath, "LONGDES", stored, true);
        QString error;
        const auto erp = openErp("DSN=TagoraTexts", &error);
        QVERIFY2(erp, qPrintable(error));
        auto rs = erp->query(QStringLiteral("SELECT ID, LONGDES FROM TEXTS WHERE ") + where, {value}, &error);
        QVERIFY2(rs, qPrintable(error));
        QCOMPARE(rs->next(), found);
        if (found) {
            QCOMPARE(rs->value(0).toInt(), 1);
            QCOMPARE(rs->value(1).toString(), stored);
            QVERIFY(!rs->next());
        }
        QVERIFY(!rs->failed());
        rs.reset();
        QCOMPARE(erp->countRows(QStringLiteral("SELECT ID FROM TEXTS WHERE ") + where, {value}), found ? 1 : 0);
        QCOMPARE(erp->countRows(QStringLiteral("SELECT ID FROM TEXTS")), 2);
    }

    // Values written into an SQLite statement: only a marker SQLite itself
    // would take is one, and a value that has no safe literal leaves the
    // statement to binding (empty).
    void sqliteLiterals_data()
    {
        QTest::addColumn<QString>("sql");
        QTest::addColumn<QVariantList>("values");
        QTest::addColumn<QString>("sent");
        QTest::newRow("marks in a comment, a name and a literal")
            << "/* ? */ \"?\" = ? AND '?' = [?] -- ?\n AND `?` < ?" << QVariantList{1, 2.5}
            << "/* ? */ \"?\" =  1  AND '?' = [?] -- ?\n AND `?` <  2.5 ";
        QTest::newRow("apostrophes doubled, backslash as is")
            << "A = ?" << QVariantList{"\\'; DELETE FROM T; --"} << "A =  '\\''; DELETE FROM T; --' ";
        QTest::newRow("null, whole real, date")
            << "? ? ?" << QVariantList{QVariant(), 3.0, QDate(2026, 12, 6)} << " NULL   3.0   '2026-12-06' ";
        QTest::newRow("character beyond 16 bits") << "A = ?" << QVariantList{QString::fromUtf8("\xF0\x9F\x98\x80")} << "";
        QTest::newRow("NUL in a text") << "A = ?" << QVariantList{QString(QChar(0))} << "";
        QTest::newRow("more values than marks") << "A = ?" << QVariantList{1, 2} << "";
        QTest::newRow("numbered mark") << "A = ?1" << QVariantList{1} << "";
    }
    void sqliteLiterals()
    {
        QFETCH(QString, sql);
        QFETCH(QVariantList, values);
        QFETCH(QString, sent);
        QCOMPARE(ErpConnection::inlineSqliteValues(sql, values), sent);
    }
};

QTEST_GUILESS_MAIN(TestOdbc)
#include "tst_odbc.moc"
