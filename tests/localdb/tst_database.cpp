#include "localdb/database.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QTemporaryDir>
#include <QtTest>

using namespace tagora;

class TestDatabase : public QObject {
    Q_OBJECT
    QTemporaryDir dir;

    QString fresh(const QString& name)
    {
        const QString path = dir.filePath(name);
        QFile::remove(path);
        return path;
    }

private slots:
    void initTestCase() { Database::setBusyTimeout(100); }

    void valuesRoundTrip_data()
    {
        QTest::addColumn<QVariant>("in");
        QTest::addColumn<QVariant>("out");
        QTest::newRow("null") << QVariant() << QVariant();
        QTest::newRow("true") << QVariant(true) << QVariant(qlonglong(1));
        QTest::newRow("whole") << QVariant(-32768) << QVariant(qlonglong(-32768));
        QTest::newRow("double") << QVariant(12.75) << QVariant(12.75);
        QTest::newRow("hebrew") << QVariant(QString::fromUtf8("שלום \"עולם\" 'x'")) << QVariant(QString::fromUtf8("שלום \"עולם\" 'x'"));
        // Declared widths are not limits: an ERP text longer than its field is kept whole.
        QTest::newRow("longer than width") << QVariant(QString(300, 'x')) << QVariant(QString(300, 'x'));
        QTest::newRow("date") << QVariant(QDate(2024, 2, 29)) << QVariant(QString("2024-02-29"));
        QTest::newRow("date time") << QVariant(QDateTime(QDate(2024, 2, 29), QTime(13, 5, 9))) << QVariant(QString("2024-02-29 13:05:09"));
    }
    void valuesRoundTrip()
    {
        QFETCH(QVariant, in);
        QFETCH(QVariant, out);
        Database db;
        QVERIFY(!db.open(fresh("values.db"), Database::OpenMode::Create));
        QVERIFY(!db.exec("CREATE TABLE t (k TEXT(5) NOT NULL, v, CONSTRAINT PrimaryKey PRIMARY KEY (k))"));
        Statement ins = db.prepare("INSERT INTO t (k, v) VALUES (:k, :v)");
        QVERIFY(ins.bind(":k", "a"));
        QVERIFY(ins.bind(":v", in));
        QVERIFY(!ins.run());
        Statement sel = db.prepare("SELECT v AS Value FROM t");
        QCOMPARE(sel.step(), Statement::Step::Row);
        QCOMPARE(sel.value("VALUE"), out);
        QCOMPARE(sel.isNull(0), !out.isValid());
        QCOMPARE(sel.columnIndex("nothing"), -1);
    }

    // The import's writer binds text it encoded itself: the bytes stored
    // must be those the ordinary binding stores, odd texts included, and a
    // buffer filled again must not keep the longer text before it.
    void preparedTextStoresSameBytes_data()
    {
        QTest::addColumn<QString>("text");
        QTest::newRow("empty") << QString();
        QTest::newRow("hebrew") << QString::fromUtf8("מחיר ₪ 12");
        QTest::newRow("emoji") << QString::fromUtf8("x😀y");
        QTest::newRow("lone high surrogate") << QString(QChar(0xD83D)) + "z";
        QTest::newRow("lone low surrogate") << "z" + QString(QChar(0xDE00));
    }
    void preparedTextStoresSameBytes()
    {
        QFETCH(QString, text);
        Database db;
        QVERIFY(!db.open(fresh("bytes.db"), Database::OpenMode::Create));
        QVERIFY(!db.exec("CREATE TABLE t (a, b)"));
        Statement ins = db.prepare("INSERT INTO t (a, b) VALUES (?1, ?2)");
        BindValue v;
        v.setText(QString(40, QChar(0x05D0)));
        v.setText(text);
        QVERIFY(ins.bind(1, QVariant(text)));
        QVERIFY(ins.bind(2, v));
        QVERIFY(!ins.run());
        QCOMPARE(db.scalar("SELECT hex(b) FROM t").toString(), db.scalar("SELECT hex(a) FROM t").toString());
        QCOMPARE(v.toVariant().toString(), QString::fromUtf8(text.toUtf8()));
    }

    // A column read as text is what its value reads as, for every kind of
    // value the engine holds; NULL is empty text.
    void textOfValues()
    {
        Database db;
        QVERIFY(!db.open(fresh("text.db"), Database::OpenMode::Create));
        Statement sel = db.prepare("SELECT NULL, 0, -9223372036854775808, 42, 12.75, 0.1 + 0.2, 1e300, -0.0, 'שלום',"
                                   " '', x'00ff41', x'', 'a' || char(0) || 'b'");
        QCOMPARE(sel.step(), Statement::Step::Row);
        for (int i = 0; i < sel.columnCount(); ++i)
            QCOMPARE(sel.text(i), sel.value(i).toString());
        QVERIFY(sel.text(0).isEmpty());
        QCOMPARE(sel.text(3), QString("42"));
        QCOMPARE(sel.text(8), QString::fromUtf8("שלום"));
        QCOMPARE(sel.text(-1), QString());
        QCOMPARE(sel.text(sel.columnCount()), QString());
    }

    void keyViolations_data()
    {
        QTest::addColumn<QString>("second");
        QTest::addColumn<bool>("duplicate");
        QTest::newRow("same key") << "INSERT INTO t VALUES ('a', 'b', 2)" << true;
        QTest::newRow("unique index") << "INSERT INTO t VALUES ('z', 'b', 1)" << true;
        QTest::newRow("null key") << "INSERT INTO t VALUES (NULL, 'c', 3)" << false;
        QTest::newRow("syntax") << "INSERT INTO t VALUES (" << false;
    }
    void keyViolations()
    {
        QFETCH(QString, second);
        QFETCH(bool, duplicate);
        Database db;
        QVERIFY(!db.open(fresh("keys.db"), Database::OpenMode::Create));
        QVERIFY(!db.exec("CREATE TABLE t (a TEXT NOT NULL, b TEXT NOT NULL, n, CONSTRAINT PrimaryKey PRIMARY KEY (a, b));"
                         "CREATE UNIQUE INDEX tn ON t (n); INSERT INTO t VALUES ('a', 'b', 1)"));
        const DbError e = db.exec(second);
        QVERIFY(e.isError());
        QCOMPARE(e.isDuplicateKey(), duplicate);
        QVERIFY(!e.message.isEmpty());
    }

    void transactionRollsBackUnlessCommitted()
    {
        Database db;
        QVERIFY(!db.open(fresh("tx.db"), Database::OpenMode::Create));
        QVERIFY(!db.exec("CREATE TABLE t (a)"));
        {
            Transaction tx(db);
            QVERIFY(!db.exec("INSERT INTO t VALUES (1)"));
        }
        QCOMPARE(db.scalar("SELECT count(*) FROM t").toInt(), 0);
        {
            Transaction tx(db);
            QVERIFY(!db.exec("INSERT INTO t VALUES (1)"));
            QVERIFY(!tx.commit());
        }
        QCOMPARE(db.scalar("SELECT count(*) FROM t").toInt(), 1);
        QVERIFY(!db.inTransaction());
    }

    void openFailures_data()
    {
        QTest::addColumn<QByteArray>("content");
        QTest::addColumn<bool>("exists");
        QTest::addColumn<bool>("notFound");
        QTest::newRow("missing") << QByteArray() << false << true;
        QTest::newRow("not a database") << QByteArray("just some text, long enough to look like a file header......")
                                        << true << false;
        QTest::newRow("empty file is a new database") << QByteArray() << true << false;
    }
    void openFailures()
    {
        QFETCH(QByteArray, content);
        QFETCH(bool, exists);
        QFETCH(bool, notFound);
        const QString path = fresh("open.db");
        if (exists) {
            QFile f(path);
            QVERIFY(f.open(QIODevice::WriteOnly));
            f.write(content);
        }
        Database db;
        const DbError e = db.open(path);
        if (exists && content.isEmpty()) {
            QVERIFY(!e);
            return;
        }
        QVERIFY(e.isError());
        QCOMPARE(e.kind == DbError::Kind::NotFound, notFound);
        QVERIFY(e.message.contains(QDir::toNativeSeparators(path)));
        QVERIFY(!db.isOpen());
        if (exists) {
            QFile f(path);
            QVERIFY(f.open(QIODevice::ReadOnly));
            QCOMPARE(f.readAll(), content);
        }
    }

    void lockedFileFailsInsteadOfHanging()
    {
        const QString path = fresh("locked.db");
        Database holder;
        QVERIFY(!holder.open(path, Database::OpenMode::Create));
        QVERIFY(!holder.exec("CREATE TABLE t (a); BEGIN EXCLUSIVE; INSERT INTO t VALUES (1)"));
        Database other;
        const DbError e = other.open(path);
        QVERIFY(e.isError());
        // In words the user can act on, naming the file once.
        QVERIFY2(e.message.contains(QString::fromUtf8("תפוס")), qPrintable(e.message));
        QCOMPARE(e.message.count(QDir::toNativeSeparators(QFileInfo(path).absoluteFilePath())), 1);
        holder.exec("ROLLBACK");
    }

    // A prepared text is one statement: what follows its ';' would be dropped
    // without a word, so it is refused; blanks, comments and empty statements
    // may follow.
    void oneStatementPrepared_data()
    {
        QTest::addColumn<QString>("sql");
        QTest::addColumn<bool>("refused");
        QTest::newRow("second statement") << "SELECT count(*) FROM t; DELETE FROM t" << true;
        QTest::newRow("statement after a comment") << "SELECT count(*) FROM t; -- then\nDELETE FROM t" << true;
        QTest::newRow("closing semicolon") << "SELECT count(*) FROM t;" << false;
        QTest::newRow("empty statements and a comment") << "SELECT count(*) FROM t; ; -- done" << false;
        QTest::newRow("semicolon in a literal") << "SELECT count(*) FROM t WHERE a <> 'x;y'" << false;
    }
    void oneStatementPrepared()
    {
        QFETCH(QString, sql);
        QFETCH(bool, refused);
        const QString path = fresh("one.db");
        Database db;
        QVERIFY(!db.open(path, Database::OpenMode::Create));
        QVERIFY(!db.exec("CREATE TABLE t (a); INSERT INTO t VALUES (1)"));
        DbError e;
        Statement s = db.prepare(sql, &e);
        QCOMPARE(e.isError(), refused);
        QCOMPARE(s.isValid(), !refused);
        if (refused) {
            QVERIFY2(e.message.contains(QString::fromUtf8("יותר מפקודה אחת")), qPrintable(e.message));
            QCOMPARE(s.step(), Statement::Step::Error);
        } else {
            QCOMPARE(s.step(), Statement::Step::Row);
            QCOMPARE(s.value(0).toInt(), 1);
        }
    }

    // A piece of SQL for the inside of a statement: only a ';' the engine
    // reads as an end counts.
    void statementEndInPiece_data()
    {
        QTest::addColumn<QString>("piece");
        QTest::addColumn<bool>("ends");
        QTest::newRow("after a closing bracket") << "1) FROM t; SELECT (1" << true;
        QTest::newRow("trigger words") << "create trigger x; select 1" << true;
        QTest::newRow("literal with a doubled apostrophe") << "'it''s;' || a" << false;
        QTest::newRow("quoted name") << "\"a;b\" + [c;d]" << false;
        QTest::newRow("comments") << "a /* ; */ -- ;" << false;
        QTest::newRow("none") << "a || 'b'" << false;
    }
    void statementEndInPiece()
    {
        QFETCH(QString, piece);
        QFETCH(bool, ends);
        QCOMPARE(HoldsStatementEnd(piece), ends);
    }

    void linksAndQueries()
    {
        const QString src = fresh("source.db");
        {
            Database s;
            QVERIFY(!s.open(src, Database::OpenMode::Create));
            QVERIFY(!s.exec("CREATE TABLE tItems (ItemKey TEXT, Price DOUBLE); INSERT INTO tItems VALUES ('A', 1)"));
        }
        const QString path = fresh("linking.db");
        {
            Database db;
            QVERIFY(!db.open(path, Database::OpenMode::Create));
            QVERIFY(!db.attachTable(src, "tItems"));
            QVERIFY(!db.createQuery("qCheap", "SELECT ItemKey FROM tItems WHERE Price < 5"));
            QVERIFY(!db.createQuery("qRaise", "UPDATE tItems SET Price = Price + 10"));
            QVERIFY(db.createQuery("qBroken", "SELECT FROM WHERE").isError());
            QCOMPARE(db.queryNames(), QStringList({"qCheap", "qRaise"}));
            // A link to a file or table that is not there is refused and not made.
            for (const QString& table : {"tOther", "tNone"}) {
                const DbError e = db.attachTable(table == "tNone" ? src : fresh("none.db"), table);
                QCOMPARE(e.kind, DbError::Kind::NotFound);
                QVERIFY2(e.message.contains(table), qPrintable(e.message));
            }
            QCOMPARE(db.links().size(), size_t(1));
        }
        Database db;
        QVERIFY(!db.open(path));
        QCOMPARE(db.scalar("SELECT ItemKey FROM qCheap").toString(), QString("A"));
        int changed = 0;
        QVERIFY(!db.runQuery("qRaise", &changed));
        QCOMPARE(changed, 1);
        QCOMPARE(db.scalar("SELECT count(*) FROM qCheap").toInt(), 0);
        QVERIFY(db.runQuery("qNoSuch").isError());
        db.close();
        Database s;
        QVERIFY(!s.open(src));
        QCOMPARE(s.scalar("SELECT Price FROM tItems").toDouble(), 11.0);
    }

    // A link reads the file of its name beside the linking file, so a data
    // folder moved or copied elsewhere reads its own files; the recorded path
    // serves only when nothing of that name is beside it.
    void linkPrefersItsOwnFolder_data()
    {
        QTest::addColumn<bool>("copyItems");
        QTest::addColumn<bool>("moveItems");
        QTest::addColumn<QString>("read");
        QTest::newRow("folder moved") << false << true << "original";
        QTest::newRow("folder copied") << true << false << "copy";
        QTest::newRow("linking file alone copied") << false << false << "original";
    }
    void linkPrefersItsOwnFolder()
    {
        QFETCH(bool, copyItems);
        QFETCH(bool, moveItems);
        QFETCH(QString, read);
        QTemporaryDir a, b;
        {
            Database s;
            QVERIFY(!s.open(a.filePath("items.db"), Database::OpenMode::Create));
            QVERIFY(!s.exec("CREATE TABLE tItems (ItemKey TEXT); INSERT INTO tItems VALUES ('original')"));
            Database db;
            QVERIFY(!db.open(a.filePath("docs.db"), Database::OpenMode::Create));
            QVERIFY(!db.attachTable(a.filePath("items.db"), "tItems"));
        }
        QVERIFY(QFile::copy(a.filePath("docs.db"), b.filePath("docs.db")));
        if (moveItems)
            QVERIFY(QFile::rename(a.filePath("items.db"), b.filePath("items.db")));
        if (copyItems) {
            QVERIFY(QFile::copy(a.filePath("items.db"), b.filePath("items.db")));
            Database copy;
            QVERIFY(!copy.open(b.filePath("items.db")));
            QVERIFY(!copy.exec("UPDATE tItems SET ItemKey = 'copy'"));
        }
        Database db;
        QVERIFY(!db.open(b.filePath("docs.db")));
        QCOMPARE(db.scalar("SELECT ItemKey FROM tItems").toString(), read);
    }

    // A linked file that cannot serve: the file still opens, and what uses the
    // table is told which file is wrong and how, directly or through a query.
    void brokenLinkNamesItsFile_data()
    {
        QTest::addColumn<QByteArray>("content"); // of items.db; empty: no such file
        QTest::addColumn<bool>("notFound");
        QTest::addColumn<QString>("says");
        QTest::newRow("missing") << QByteArray() << true << QString::fromUtf8("אינו נמצא");
        QTest::newRow("not a database") << QByteArray(4096, 'x') << false
                                        << QString::fromUtf8("אינו קובץ בסיס נתונים או שהוא פגום");
        QTest::newRow("damaged") << QByteArray("damaged") << false
                                 << QString::fromUtf8("אינו קובץ בסיס נתונים או שהוא פגום");
        QTest::newRow("without the table") << QByteArray("other table") << true << QString::fromUtf8("אין טבלה");
    }
    void brokenLinkNamesItsFile()
    {
        QFETCH(QByteArray, content);
        QFETCH(bool, notFound);
        QFETCH(QString, says);
        QTemporaryDir d;
        const QString items = d.filePath("items.db");
        {
            Database s;
            QVERIFY(!s.open(items, Database::OpenMode::Create));
            QVERIFY(!s.exec("CREATE TABLE tItems (ItemKey TEXT); INSERT INTO tItems VALUES ('A')"));
            Database db;
            QVERIFY(!db.open(d.filePath("docs.db"), Database::OpenMode::Create));
            QVERIFY(!db.attachTable(items, "tItems"));
            QVERIFY(!db.createQuery("qKeys", "SELECT ItemKey FROM tItems"));
        }
        if (content == "damaged") {
            // A sound header over a schema page that is not one.
            QFile f(items);
            QVERIFY(f.open(QIODevice::ReadWrite));
            QVERIFY(f.seek(100));
            f.write(QByteArray(int(f.size()) - 100, '\xff'));
        } else if (content == "other table") {
            Database s;
            QVERIFY(!s.open(items));
            QVERIFY(!s.exec("DROP TABLE tItems; CREATE TABLE tOther (a)"));
        } else {
            QVERIFY(QFile::remove(items));
            if (!content.isEmpty()) {
                QFile f(items);
                QVERIFY(f.open(QIODevice::WriteOnly));
                f.write(content);
            }
        }
        Database db;
        QVERIFY(!db.open(d.filePath("docs.db")));
        for (const char* sql : {"SELECT ItemKey FROM tItems", "SELECT * FROM qKeys"}) {
            DbError e;
            db.scalar(sql, &e);
            QVERIFY(e.isError());
            QVERIFY2(e.message.contains(QDir::toNativeSeparators(items)), qPrintable(e.message));
            QVERIFY2(e.message.contains(says), qPrintable(e.message));
            QCOMPARE(e.kind == DbError::Kind::NotFound, notFound);
        }
    }
};

QTEST_GUILESS_MAIN(TestDatabase)
#include "tst_database.moc"
