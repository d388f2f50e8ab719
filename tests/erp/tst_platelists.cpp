// The ERP's label lists against the demo company: users, definitions and one
// user's lines read into the temporary documents database, and the query
// the label run prints them with.
#include "support/dbrows.h"
#include "support/erpfixture.h"

#include "erp/platelists.h"
#include "erp/textconv.h"
#include "localdb/schema.h"

#include <QtTest>

using namespace tagora;

namespace {
QString connFor(const QString& dsn)
{
    return QStringLiteral("DSN=%1;Uid=sa;pwd=").arg(dsn);
}

// A stored cell-form parameter without its separators and mirroring: the
// characters as the label shows them, one cell after another.
QString fromCells(const QString& cells)
{
    QString out;
    for (QChar c : cells)
        if (c != kCellSeparator)
            out += MirrorChar(c);
    return out;
}

QString reversed(QString text)
{
    std::reverse(text.begin(), text.end());
    return text;
}
} // namespace

class TestPlateLists : public QObject {
    Q_OBJECT
    QTemporaryDir dir;
    OdbcSandbox odbc;
    QString erpPath[3];
    int folders = 0;

    // A fresh temporary documents database in a data folder of its own.
    QString tempDocs()
    {
        const QString folder = dir.filePath(QStringLiteral("data%1").arg(++folders));
        if (PrepareDataFolder(folder))
            qFatal("data folder");
        DbError e;
        const QString db = CreateTempDocsDB(folder + "/" + dbfiles::Config, folder + "/" + dbfiles::Items,
                                            folder + "/" + dbfiles::TempDocs, &e);
        if (db.isEmpty())
            qFatal("%s", qPrintable(e.message));
        return db;
    }

    ErpReadContext context(short connType)
    {
        setErpConnType(connType == 2 ? 2 : 1);
        ErpReadContext ctx;
        ctx.connString = connFor(QStringLiteral("plate%1").arg(connType));
        return ctx;
    }

private slots:
    void initTestCase()
    {
        for (short type : {1, 2}) {
            DemoOptions o;
            o.connType = type;
            erpPath[type] = odbc.addDemo(QStringLiteral("plate%1").arg(type), o);
        }
    }

    void users()
    {
        QString error;
        setErpConnType(1);
        const QVector<ErpUser> users = ReadErpUsers(connFor("plate1"), &error);
        QVERIFY2(error.isEmpty(), qPrintable(error));
        QStringList seen;
        for (const ErpUser& u : users)
            seen << QStringLiteral("%1:%2").arg(u.user).arg(u.login);
        // Above 0, with a login; a Hebrew login in reading order.
        QCOMPARE(seen, QStringList({"1:admin", "2:avi", QString::fromUtf8("3:דנה"), "4:moshe.k", "6:warehouse"}));
    }

    void definitions_data()
    {
        QTest::addColumn<int>("labelDef");
        QTest::addColumn<bool>("ownFile");
        QTest::newRow("file on this computer") << 1 << true;
        QTest::newRow("empty path") << 2 << false;
        QTest::newRow("null path") << 3 << false;
        QTest::newRow("file not here") << 4 << false;
    }
    void definitions()
    {
        QFETCH(int, labelDef);
        QFETCH(bool, ownFile);
        const QString own = dir.filePath("shelf.lbl");
        QFile f(own);
        QVERIFY(f.open(QIODevice::WriteOnly) && f.write("x") == 1);
        f.close();
        QVERIFY(!execOn(erpPath[2], QStringLiteral("UPDATE LABELSDEF SET LABELPATH = '%1' WHERE LABELDEF = 1").arg(own)));
        const QString db = tempDocs();
        ReadError e;
        QVERIFY2(ReadLabelDefPriority(context(2), db, "/default.lbl", &e), qPrintable(e.message));
        QCOMPARE(scalar(db, "SELECT count(*) FROM tPLabDef").toInt(), 5);
        QCOMPARE(scalar(db, QStringLiteral("SELECT LabelPath FROM tPLabDef WHERE LabelID = %1").arg(labelDef)).toString(),
                 ownFile ? own : QStringLiteral("/default.lbl"));
    }

    void parameters_data()
    {
        QTest::addColumn<short>("connType");
        QTest::newRow("visual order (type 1)") << short(1);
        QTest::newRow("logical order (type 2)") << short(2);
    }
    void parameters()
    {
        QFETCH(short, connType);
        const QString db = tempDocs();
        ReadError e;
        QVERIFY2(ReadLabelDataPriority(context(connType), db, 6, &e), qPrintable(e.message));
        const QStringList erp = rows(erpPath[connType], "SELECT KLINE, PAR2 FROM LABELS WHERE USER = 6 ORDER BY KLINE");
        QCOMPARE(scalar(db, "SELECT count(*) FROM tPLabData").toInt(), erp.size());
        // Null and empty parameters stay empty.
        QCOMPARE(scalar(db, "SELECT count(*) FROM tPLabData WHERE Par6 IS NOT NULL OR Par7 IS NOT NULL").toInt(), 0);
        // Hebrew in visual order goes to the label in cell form, whole
        // however long (the long one takes 2n + 1 > 100 characters); text
        // in logical order, or without Hebrew, as it stands.
        const QString longText = QString::fromUtf8("מדבקה עם תאור ארוך במיוחד שאינו נכנס בשדה של מאה תווים");
        const QStringList stored = rows(db, "SELECT Par2 FROM tPLabData ORDER BY KLine");
        QCOMPARE(connType == 2 ? stored.last() : fromCells(stored.last()), longText);
        for (qsizetype i = 0; i < stored.size(); ++i) {
            const QString raw = erp[i].section('|', 1);
            if (connType == 2 || !HasHebrewLetters(raw)) {
                QCOMPARE(stored[i], raw);
            } else {
                QCOMPARE(stored[i].size(), 2 * raw.size() + 1);
                QCOMPARE(fromCells(stored[i]), reversed(raw));
            }
        }
    }

    void emptyList()
    {
        const QString db = tempDocs();
        ReadError e;
        QVERIFY(ReadLabelDataPriority(context(2), db, 3, &e));
        QCOMPARE(scalar(db, "SELECT count(*) FROM tPLabData").toInt(), 0);
    }

    // An ERP without one of the tables: the reader says which list failed,
    // with the ERP's message, and keeps nothing.
    void missingTable_data()
    {
        QTest::addColumn<QString>("table");
        QTest::addColumn<QString>("title");
        QTest::newRow("USERS") << "USERS" << QString();
        QTest::newRow("LABELSDEF") << "LABELSDEF" << QString::fromUtf8("שגיאה בקריאת סוגי מדבקות");
        QTest::newRow("LABELS") << "LABELS" << QString::fromUtf8("שגיאה בקריאת נתונים מהמשטח");
    }
    void missingTable()
    {
        QFETCH(QString, table);
        QFETCH(QString, title);
        const QString name = "bare" + table;
        DemoOptions o;
        const QString path = odbc.addDemo(name, o);
        QVERIFY(!execOn(path, "DROP TABLE " + table));
        const QString before = QString::fromLatin1(QCryptographicHash::hash(readFile(path), QCryptographicHash::Sha1).toHex());
        setErpConnType(2);
        ErpReadContext ctx;
        ctx.connString = connFor(name);
        const QString db = tempDocs();
        ReadError e;
        QString userError;
        const bool defs = ReadLabelDefPriority(ctx, db, "/d.lbl", &e);
        const bool data = defs ? ReadLabelDataPriority(ctx, db, 1, &e) : false;
        const QVector<ErpUser> users = ReadErpUsers(ctx.connString, &userError);
        if (title.isEmpty()) {
            QVERIFY(defs && data);
            QVERIFY(users.isEmpty());
            QVERIFY(userError.contains(table, Qt::CaseInsensitive));
        } else {
            QVERIFY(!(defs && data));
            QCOMPARE(e.title, title);
            QVERIFY2(e.message.contains(table, Qt::CaseInsensitive), qPrintable(e.message));
            QCOMPARE(scalar(db, table == "LABELS" ? "SELECT count(*) FROM tPLabData" : "SELECT count(*) FROM tPLabDef").toInt(), 0);
        }
        QCOMPARE(QString::fromLatin1(QCryptographicHash::hash(readFile(path), QCryptographicHash::Sha1).toHex()), before);
    }

    void queryColumns_data()
    {
        QTest::addColumn<bool>("sent");
        QTest::addColumn<QString>("caption");
        QTest::addColumn<bool>("column");
        QTest::newRow("sent with a number") << true << " 3 " << true;
        QTest::newRow("sent without a number") << true << "" << false;
        QTest::newRow("number not sent") << false << "3" << false;
        QTest::newRow("beyond the parameters") << true << "21" << false;
        QTest::newRow("not a whole number") << true << "1.5" << false;
    }
    void queryColumns()
    {
        QFETCH(bool, sent);
        QFETCH(QString, caption);
        QFETCH(bool, column);
        const QString db = tempDocs();
        QVERIFY(!execOn(db, "INSERT INTO tPLabDef (LabelID, LabelName, LabelPath) VALUES (1, 'a', 'a.lbl');"
                            "INSERT INTO tPLabData (KLine, Copies, LabelID, LineSort, Par3) VALUES (1, 2, 1, 1, 'p3')"));
        const QString sql = PlateItemQuery("O'R", {{sent, caption, "ItemKey"}, {false, "", "ItemName"}}, 1);
        QCOMPARE(rows(db, sql), QStringList{column ? "2|a.lbl|O'R|p3" : "2|a.lbl|O'R"});
    }

    void queryOrder_data()
    {
        QTest::addColumn<int>("orderBy");
        QTest::addColumn<QStringList>("lines");
        QTest::newRow("ascending") << 1 << QStringList({"3", "1", "4", "2"});
        QTest::newRow("descending, both keys") << 2 << QStringList({"2", "4", "1", "3"});
    }
    void queryOrder()
    {
        QFETCH(int, orderBy);
        QFETCH(QStringList, lines);
        const QString db = tempDocs();
        QVERIFY(!execOn(db, "INSERT INTO tPLabDef (LabelID, LabelName, LabelPath) VALUES (1, 'a', 'a.lbl');"
                            "INSERT INTO tPLabData (KLine, Copies, LabelID, LineSort, Par1) VALUES"
                            " (1, 1, 1, 1, '1'), (2, 1, 1, 2, '2'), (3, 1, 1, 0, '3'), (4, 1, 1, 1, '4')"));
        QStringList got;
        for (const QString& row : rows(db, PlateItemQuery("", {{true, "1", "Line"}}, uchar(orderBy))))
            got << row.section('|', 3);
        QCOMPARE(got, lines);
    }

private:
    static QByteArray readFile(const QString& path)
    {
        QFile f(path);
        return f.open(QIODevice::ReadOnly) ? f.readAll() : QByteArray();
    }
};

QTEST_MAIN(TestPlateLists)
#include "tst_platelists.moc"
