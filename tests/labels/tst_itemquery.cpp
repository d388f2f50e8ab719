#include "support/dbrows.h"
#include "support/labeldata.h"

#include "labels/itemquery.h"

#include <QtTest>

using namespace tagora;

namespace {
QStringList columnsOf(const QString& db, const QString& sql)
{
    Database d;
    d.open(db);
    Statement s = d.prepare(sql);
    QStringList names;
    for (int i = 0; i < s.columnCount(); ++i)
        names << s.columnName(i);
    return names;
}

LabelQuerySettings sending(std::initializer_list<int> rows)
{
    LabelQuerySettings s;
    for (int r : rows)
        s.sent[size_t(r)] = true;
    return s;
}
} // namespace

class TestItemQuery : public QObject {
    Q_OBJECT
    LabelData data;

private slots:
    // What each account-dependent column holds, by items, with and without an account.
    void accountColumns_data()
    {
        QTest::addColumn<bool>("use");
        QTest::addColumn<QString>("key");
        QTest::addColumn<QString>("expected");
        const QString columns = "AccountKey|CardCode|CardName|AlterKey|SpecialPrice|AlterBar|ListPrice";
        QTest::newRow("no account") << false << "O'Brien" << "NoKey|NoCode|NoName|A1|5|7290000000015|5";
        QTest::newRow("ticked but empty") << true << "" << "NoKey|NoCode|NoName|A1|5|7290000000015|5";
        QTest::newRow("account with apostrophe") << true << "O'Brien" << "O'Brien|O'Brien|O'Brien|OB-A1|4.5|OBBAR1|4.75";
        QTest::newRow("account typed in another case") << true << "o'brien" << "o'brien|o'brien|o'brien|OB-A1|4.5|OBBAR1|4.75";
        QTest::newRow("account without data") << true << "Nobody" << "Nobody|Nobody|Nobody|<null>|<null>|<null>|<null>";
    }
    void accountColumns()
    {
        QFETCH(bool, use);
        QFETCH(QString, key);
        QFETCH(QString, expected);
        LabelQuerySettings s = sending({9, 11, 12, 13, 14, 15});
        s.useAccountKey = use;
        s.accountKey = key;
        const QString sql = QStringLiteral("SELECT AccountKey, CardCode, CardName, AlterKey, SpecialPrice, AlterBar, ListPrice "
                                           "FROM (%1) WHERE ItemKey = 'A1'").arg(BuildItemQuery(s, 1, 1));
        QCOMPARE(rows(data.docs, sql), QStringList{expected});
    }

    void placeholdersByItems()
    {
        LabelQuerySettings s = sending({8, 10, 17, 18, 19, 20, 22, 23, 24, 25, 26, 27, 28});
        const QStringList r = rows(data.docs, "SELECT SerialNum, Reference1, PackRem, ExtraSum1, ExtraSum3, Quantity, AlterNum,"
                                              " AgentName, ItemKeySon, ItemNameSon, LineItemName, Details FROM (" +
                                                  BuildItemQuery(s, 1, 1) + ") WHERE ItemKey = 'B1'");
        QCOMPARE(r, QStringList{"NoSerial|NoRef|NoRem|NoSum|NoSum|3|NoAlter|NoName|NoName|NoName|NoName|NoDetails"});
    }

    void documentsRows()
    {
        LabelQuerySettings s = sending({9, 12, 14, 15, 17, 23, 24, 27});
        const QString sql = BuildItemQuery(s, 2, 1);
        QCOMPARE(rows(data.docs, "SELECT Number, ItemKey, Copies, CardCode, AlterKey, ListPrice, CardName, PackRem, AlterNum,"
                                 " AgentName, LineItemName FROM (" + sql + ")"),
                 QStringList({"100|A1|4|O'Brien|OB-A1|4.75|O'Brien Ltd|fragile|L-A1|Dana|Bolt line",
                              "100|A2|1|O'Brien|<null>|1.25|O'Brien Ltd|fragile|<null>|<null>|Nut line",
                              "101|B1|2|C2|<null>|<null>|Second|<null>|<null>|<null>|Washer line"}));
        // Descending turns documents, headers and lines around together.
        QCOMPARE(rows(data.docs, "SELECT Number || '/' || ItemKey FROM (" + BuildItemQuery(s, 2, 2) + ")"),
                 QStringList({"101/B1", "100/A2", "100/A1"}));
    }

    void orderAndRange_data()
    {
        QTest::addColumn<int>("order");
        QTest::addColumn<QString>("criteria");
        QTest::addColumn<QString>("keys");
        QTest::newRow("ascending") << 1 << "" << "A1 A2 B1";
        QTest::newRow("descending") << 2 << "" << "B1 A2 A1";
        QTest::newRow("open-ended from") << 1 << ItemRangeCriteria("A2", "", "", "") << "A2 B1";
        QTest::newRow("family range") << 1 << ItemRangeCriteria("", "", "20", "20") << "B1";
        QTest::newRow("bounds in another case") << 1 << ItemRangeCriteria("a2", "b1", "", "") << "A2 B1";
        QTest::newRow("bound with apostrophe") << 1 << ItemRangeCriteria("", "A1'", "", "") << "A1";
    }
    void orderAndRange()
    {
        QFETCH(int, order);
        QFETCH(QString, criteria);
        QFETCH(QString, keys);
        LabelQuerySettings s;
        s.itemRangeCriteria = criteria;
        QCOMPARE(rows(data.docs, "SELECT ItemKey FROM (" + BuildItemQuery(s, 1, order) + ")").join(' '), keys);
    }

    void companyAndExpressions()
    {
        LabelQuerySettings s = sending({32, 33, 37});
        s.companyName = "Acme \"Tools\", Ltd's";
        s.expressions[33] = "ItemKey || \"-\" || Unit";
        s.expressions[37] = "Price * 2";
        QCOMPARE(rows(data.docs, "SELECT CompName, EX1, EX5 FROM (" + BuildItemQuery(s, 1, 1) + ") WHERE ItemKey = 'A1'"),
                 QStringList{"Acme Tools Ltds|A1-pc|10"});
    }

    // A ticked expression row with nothing to compute has no column, and the
    // query still runs.
    void blankExpressionHasNoColumn_data()
    {
        QTest::addColumn<QString>("expression");
        QTest::newRow("empty") << "";
        QTest::newRow("blanks") << "   ";
    }
    void blankExpressionHasNoColumn()
    {
        QFETCH(QString, expression);
        LabelQuerySettings s = sending({33, 34});
        s.expressions[33] = expression;
        s.expressions[34] = "Unit";
        for (int type : {1, 2}) {
            const QStringList columns = columnsOf(data.docs, BuildItemQuery(s, type, 1));
            QCOMPARE(columns.mid(columns.size() - 1), QStringList{"EX2"});
            QVERIFY(!columns.contains("EX1"));
            QVERIFY(!rows(data.docs, "SELECT EX2 FROM (" + BuildItemQuery(s, type, 1) + ")").isEmpty());
        }
        QVERIFY(!RowIsSent(s, 33));
        QVERIFY(RowIsSent(s, 34));
    }

    // An expression is part of one statement. A ';' that ends it would leave
    // the query's conditions behind (every item, marked or not) or run what
    // follows; one inside a literal or a comment is text.
    void statementEndInExpression_data()
    {
        QTest::addColumn<QString>("expression");
        QTest::addColumn<QString>("value"); // empty: refused
        QTest::newRow("query cut before its conditions") << "1) AS EX1 FROM tItems; SELECT (1" << "";
        QTest::newRow("closing semicolon") << "tItems.Unit;" << "";
        QTest::newRow("in a literal") << "'a;b'" << "a;b";
        QTest::newRow("in a double-quoted literal") << "\"x;\" || tItems.Unit" << "x;pc";
        QTest::newRow("in a comment") << "tItems.Unit /* ; */" << "pc";
    }
    void statementEndInExpression()
    {
        QFETCH(QString, expression);
        QFETCH(QString, value);
        LabelQuerySettings s = sending({33});
        s.expressions[33] = expression;
        const QString problem = CheckItemQuery(s);
        const QString sql = BuildItemQuery(s, 1, 1);
        if (!value.isEmpty()) {
            QVERIFY2(problem.isEmpty(), qPrintable(problem));
            QCOMPARE(rows(data.docs, "SELECT EX1 FROM (" + sql + ")"), QStringList(3, value));
            return;
        }
        QVERIFY(problem.contains(QStringLiteral("\"ביטוי 1\" (EX1)")));
        // Nor does the database run the query cut short.
        Database db;
        QVERIFY(!db.open(data.docs, Database::OpenMode::ReadOnly));
        DbError e;
        db.prepare(sql, &e);
        QVERIFY(e.isError());
    }
};

QTEST_GUILESS_MAIN(TestItemQuery)
#include "tst_itemquery.moc"
