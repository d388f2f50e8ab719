#include "support/dbrows.h"

#include "erp/democompany.h"
#include "erp/docimport.h"
#include "erp/itemimport.h"
#include "erp/odbc.h"
#include "erp/textconv.h"
#include "localdb/schema.h"

#include <QRegularExpression>
#include <QTemporaryDir>
#include <QtTest>

using namespace tagora;
using namespace Qt::Literals::StringLiterals;

namespace {

const QDate kToday(2024, 2, 29);

// The rows of a query as the readers send it, with the literals SQLite lacks
// rewritten and its values bound (a date as the day's text, as the ODBC layer sends it).
using Rows = QList<QVariantList>;
Rows query(const Database& db, const ErpQuery& erp, QString* error)
{
    const QString sql = ErpConnection::rewriteForSqlite(erp.sql, erp.params);
    Rows out;
    DbError e;
    Statement s = db.prepare(sql, &e);
    for (int i = 0; !e && i < erp.params.size(); ++i) {
        const QVariant& v = erp.params[i];
        s.bind(i + 1, v.typeId() == QMetaType::QDate ? QVariant(v.toDate().toString(Qt::ISODate)) : v);
    }
    Statement::Step step = Statement::Step::Error;
    while (!e && (step = s.step()) == Statement::Step::Row) {
        out << QVariantList();
        for (int c = 0; c < s.columnCount(); ++c)
            out.last() << s.value(c);
    }
    if (e || step == Statement::Step::Error)
        *error = (e ? e.message : s.error().message) + u" in: "_s + sql;
    return out;
}

Rows query(const Database& db, const QString& erpSql, QString* error)
{
    return query(db, ErpQuery{erpSql, {}}, error);
}

QStringList column(const Rows& rows, int c)
{
    QStringList out;
    for (const QVariantList& row : rows)
        out << row.value(c).toString();
    return out;
}

#define QUERY(var, db, sql)                                                                                            \
    QString var##Error;                                                                                                \
    const Rows var = query(db, sql, &var##Error);                                                                      \
    QVERIFY2(var##Error.isEmpty(), qPrintable(var##Error))

// The single number a query gives, or -1 when it fails.
int count(const Database& db, const ErpQuery& q)
{
    QString error;
    const Rows rows = query(db, q, &error);
    return error.isEmpty() ? rows.value(0).value(0).toInt() : -1;
}
int count(const Database& db, const QString& sql)
{
    return count(db, ErpQuery{sql, {}});
}

} // namespace

class TestDemoCompany : public QObject {
    Q_OBJECT

    QTemporaryDir m_dir;
    QVector<DocTypeRecipe> m_recipes;

    QString demoPath(int connType) const { return m_dir.filePath(u"demo%1.db"_s.arg(connType)); }
    static DemoOptions options(int connType)
    {
        DemoOptions o;
        o.connType = short(connType);
        o.today = kToday;
        return o;
    }
    static void connTypes()
    {
        QTest::addColumn<int>("connType");
        QTest::newRow("visual text, dates") << 1;
        QTest::newRow("logical text, minutes") << 2;
    }

private slots:
    void initTestCase()
    {
        QVERIFY(m_dir.isValid());
        for (int t : {1, 2}) {
            const DbError e = CreateDemoErp(demoPath(t), options(t));
            QVERIFY2(!e, qPrintable(e.message));
        }
        // The recipes as the supplied configuration carries them, every type
        // included, so the two never drift apart.
        const QString config = m_dir.filePath(dbfiles::Config), items = m_dir.filePath(dbfiles::Items);
        QVERIFY(!InstallConfigDatabase(config) && !execOn(config, u"UPDATE tDocTypes SET Include = TRUE"_s));
        DbError e;
        QVERIFY(!CreateItemsDB(items, &e).isEmpty());
        const QString docs = CreateTempDocsDB(config, items, m_dir.filePath(dbfiles::TempDocs), &e);
        QVERIFY2(!docs.isEmpty(), qPrintable(e.message));
        Database db;
        QVERIFY(!db.open(docs, Database::OpenMode::ReadOnly));
        m_recipes = ReadDocTypes(db, &e);
        QVERIFY2(!e, qPrintable(e.message));
        QVERIFY(!m_recipes.empty());
    }

    void itemQuery_data()
    {
        QTest::addColumn<int>("connType");
        QTest::addColumn<int>("items");
        QTest::addColumn<int>("plist");
        QTest::addColumn<bool>("joins"); // foreign names and warehouses
        for (int t : {1, 2}) {
            QTest::addRow("type %d 500 items, foreign and warehouse", t) << t << 500 << 0 << true;
            QTest::addRow("type %d base list", t) << t << 40 << 1 << false;
            QTest::addRow("type %d dollar list", t) << t << 40 << 3 << false;
        }
    }
    void itemQuery()
    {
        QFETCH(int, connType);
        QFETCH(int, items);
        QFETCH(int, plist);
        QFETCH(bool, joins);
        DemoOptions o = options(connType);
        o.items = items;
        const QString path = m_dir.filePath(u"items%1-%2.db"_s.arg(connType).arg(items));
        QVERIFY(!CreateDemoErp(path, o));
        Database db;
        QVERIFY(!db.open(path, Database::OpenMode::ReadOnly));
        QUERY(rs, db, itemQuerySql({}, {}, joins, plist, joins, {}));
        QUERY(others, db, u"SELECT PARTNAME FROM PART WHERE TYPE NOT IN ('R', 'P')"_s);
        QVERIFY(!others.isEmpty());
        const QStringList keys = column(rs, 0);
        for (const QString& other : column(others, 0))
            QVERIFY2(!keys.contains(other), qPrintable(other));
        setErpConnType(short(connType));
        const QStringList codes = column(rs, 6);
        switch (plist) {
        case 0: // every R/P item joins its family, unit, foreign name and warehouse
            QCOMPARE(rs.size(), items);
            for (const QString& key : {u"AB\"12"_s, u"O'R-5"_s, u" LEAD-7"_s, u"TRAIL-8 "_s, u"   "_s})
                QVERIFY2(keys.contains(key), qPrintable(key));
            break;
        case 1: QCOMPARE(ConvertErpText(codes.first(), {}), u"ש\"ח"_s); break;
        case 3: QCOMPARE(codes.count(u"$"_s), codes.size()); break;
        }
        QVERIFY(rs.size() <= items);
    }

    // What the part-number, price-list and special-price readers must cope with.
    void otherReaders_data() { connTypes(); }
    void otherReaders()
    {
        QFETCH(int, connType);
        Database db;
        QVERIFY(!db.open(demoPath(connType), Database::OpenMode::ReadOnly));
        // Part numbers: an account and item given twice, an empty number.
        for (bool suppliers : {false, true}) {
            QUERY(rs, db, alterKeyQuerySql(suppliers, {}));
            QSet<QString> pairs;
            for (const QVariantList& row : rs)
                pairs.insert(row[0].toString() + QChar(0) + row[1].toString());
            QVERIFY(pairs.size() < rs.size());
            QVERIFY(column(rs, 2).contains(QString()));
        }

        // The non-lists 0 and -50 among the real ones, a null price, a missing currency code.
        QUERY(lists, db, priceListQuerySql({}, {}, {}));
        for (const QString& n : {u"-50"_s, u"0"_s, u"1"_s, u"4"_s})
            QVERIFY2(column(lists, 0).contains(n), qPrintable(n));
        QVERIFY(column(lists, 3).contains(QString()));
        QVERIFY(column(lists, 2).contains(QString()));
        // List 0 has neither name nor description ("no price list"); one real list has only a name.
        QUERY(names, db, u"SELECT PLIST, PLNAME, PLDES FROM PRICELIST WHERE PLIST <> -50"_s);
        QStringList shown;
        for (const QVariantList& row : names)
            shown << u"%1:%2"_s.arg(row[0].toInt()).arg(row[2].toString().isEmpty() ? row[1].toString() : u"-"_s);
        QVERIFY(shown.contains(u"0:"_s));
        QCOMPARE(shown.filter(QRegularExpression(u"^[1-9]\\d*:(?!-$)."_s)).size(), 1);

        // Special prices in and out of date, on their first and last days.
        QUERY(valid, db, alterPriceQuerySql(DateToErp(QDate(kToday), short(connType)), {}));
        QUERY(all, db, u"SELECT FROMDATE, EXPIRYDATE FROM CUSTPARTPRICE"_s);
        int expected = 0;
        QSet<QString> kinds;
        for (const QVariantList& row : all) {
            const QDate from = ErpToDate(row[0], short(connType)).toDate();
            const QDate till = ErpToDate(row[1], short(connType)).toDate();
            QVERIFY(from.isValid() && from <= till);
            expected += from <= kToday && kToday <= till;
            for (const auto& [is, kind] : {std::pair{till == kToday, "ends today"}, {from == kToday, "starts today"},
                                           {from == kToday.addDays(1), "starts tomorrow"}, {till < kToday, "ended"}})
                if (is)
                    kinds << QLatin1String(kind);
        }
        QCOMPARE(kinds.size(), 4);
        QCOMPARE(valid.size(), expected);
        QVERIFY(column(valid, 3).contains(QString()));
    }

    void documents_data()
    {
        QTest::addColumn<int>("connType");
        QTest::addColumn<int>("recipe");
        for (int t : {1, 2})
            for (int i = 0; i < 6; ++i)
                QTest::addRow("type %d doc type %d", t, i + 1) << t << i;
    }
    void documents()
    {
        QFETCH(int, connType);
        QFETCH(int, recipe);
        QVERIFY(recipe < m_recipes.size());
        const DocTypeRecipe& r = m_recipes[recipe];
        // The import's own selections, by dates of the connection type's kind.
        auto crit = [&](bool drafts, const QVariant& from = {}, const QVariant& to = {}) {
            return BuildDocRangeCriteria(r, from, to, {}, {}, 0, drafts, u"%"_s, short(connType));
        };
        Database db;
        QVERIFY(!db.open(demoPath(connType), Database::OpenMode::ReadOnly));
        QUERY(docs, db, docHeaderSql(r, 0, crit(false)));
        QVERIFY(!docs.isEmpty());
        // Every document has its account: counted without the join, none more.
        DocTypeRecipe unjoined = r;
        unjoined.csTableId = 0;
        QCOMPARE(count(db, docCountSql(unjoined, crit(false))), int(docs.size()));
        if (!r.noDraft.isEmpty())
            QVERIFY(count(db, docCountSql(r, crit(true))) > docs.size());
        for (const QVariantList& doc : docs) {
            QUERY(lines, db, docLineSql(r, 0, doc[0].toLongLong()));
            QVERIFY(!lines.isEmpty());
            for (int l = 0; l < lines.size(); ++l)
                QCOMPARE(lines[l][2].toInt(), l + 1);
        }
        QVERIFY(count(db, docCountSql(r, crit(true, kToday.addDays(-30), kToday))) > 0);
        QCOMPARE(count(db, docCountSql(r, crit(true, kToday.addDays(1)))), 0);

        const ErpQuery onDocs = BuildItemByDocCriteria(r.headTable, r.lineTable, r.fldID, crit(false));
        QUERY(items, db, itemQuerySql({}, {}, false, 0, false, onDocs.sql, onDocs.params));
        QVERIFY(!items.isEmpty() && items.size() <= 40);
    }

    // Line quantities of every kind a document import must turn into copies.
    void documentLines()
    {
        Database db;
        QVERIFY(!db.open(demoPath(2), Database::OpenMode::ReadOnly));
        QCOMPARE(count(db, u"SELECT (SELECT max(DOC) FROM DOCUMENTS) < (SELECT min(IV) FROM INVOICES)"_s), 1);
        for (const QString& table : {u"ORDERITEMS"_s, u"PORDERITEMS"_s, u"INVOICEITEMS"_s, u"TRANSORDER"_s}) {
            QUERY(kinds, db, u"SELECT sum(QUANT = 0), sum(QUANT <> round(QUANT)), sum(QUANT > 1000), sum(QUANT < 0),"
                             " sum(TQUANT IS NULL), sum(trim(PARTNAME) = '') FROM %1 L, PART WHERE PART.PART = L.PART"_s.arg(table));
            for (int c = 0; c < 6; ++c)
                QVERIFY2(kinds[0][c].toInt() > 0 || (c == 5 && table == "PORDERITEMS"_L1), qPrintable(table + QString::number(c)));
        }
    }

    // A server where USER is a reserved word gets the company without the label lists.
    void withoutLabelLists()
    {
        DemoOptions o = options(2);
        o.labelLists = false;
        const QString path = m_dir.filePath(u"nolabels.db"_s);
        QVERIFY(!CreateDemoErp(path, o));
        Database bare, full;
        QVERIFY(!bare.open(path, Database::OpenMode::ReadOnly));
        QVERIFY(!full.open(demoPath(2), Database::OpenMode::ReadOnly));
        for (const QString& t : {u"USERS"_s, u"LABELSDEF"_s, u"LABELS"_s})
            QVERIFY2(full.hasTable(t) && !bare.hasTable(t), qPrintable(t));
        QCOMPARE(count(bare, u"SELECT count(*) FROM PART"_s), count(full, u"SELECT count(*) FROM PART"_s));
    }

    // The two connection types hold the same company, and the readers'
    // conversion of the visual text gives the logical text back.
    void connectionTypesAgree()
    {
        Database visual, logical;
        QVERIFY(!visual.open(demoPath(1), Database::OpenMode::ReadOnly));
        QVERIFY(!logical.open(demoPath(2), Database::OpenMode::ReadOnly));
        QCOMPARE(visual.tableNames(), logical.tableNames());
        int hebrew = 0, dates = 0;
        for (const QString& table : logical.tableNames()) {
            QUERY(declared, visual, u"PRAGMA table_info(%1)"_s.arg(table));
            QUERY(v, visual, u"SELECT * FROM %1 ORDER BY rowid"_s.arg(table));
            QUERY(l, logical, u"SELECT * FROM %1 ORDER BY rowid"_s.arg(table));
            QCOMPARE(v.size(), l.size());
            for (int r = 0; r < l.size(); ++r) {
                for (int c = 0; c < l[r].size(); ++c) {
                    const QVariant &a = v[r][c], &b = l[r][c];
                    const QByteArray where = (table + u'.' + declared[c][1].toString() + u' ' + b.toString()).toUtf8();
                    if (a.isNull() || b.isNull()) {
                        QVERIFY2(a.isNull() && b.isNull(), where);
                    } else if (declared[c][2].toString() == "DATE"_L1) {
                        ++dates;
                        QVERIFY2(b.toLongLong() % 1440 == 0, where);
                        QCOMPARE(QDate::fromString(a.toString(), Qt::ISODate), ErpToDate(b, 2).toDate());
                    } else if (HasHebrewLetters(b.toString())) {
                        ++hebrew;
                        QVERIFY2(a != b && VisualToLogical(a.toString(), 1) == b.toString(), where);
                    } else {
                        QVERIFY2(a == b, where);
                    }
                }
            }
        }
        QVERIFY(hebrew > 100 && dates > 50);
    }

    void barcodesAndWidths()
    {
        Database db;
        QVERIFY(!db.open(demoPath(1), Database::OpenMode::ReadOnly));
        QUERY(codes, db, u"SELECT BARCODE FROM PART"_s);
        static const QRegularExpression ean13(u"^\\d{13}$"_s);
        int valid = 0, missing = 0;
        for (const QString& code : column(codes, 0)) {
            int sum = 0;
            for (int i = 0; i < code.size(); ++i)
                sum += code[i].digitValue() * (i % 2 ? 3 : 1);
            QVERIFY2(code.isEmpty() || (ean13.match(code).hasMatch() && sum % 10 == 0), qPrintable(code));
            ++(code.isEmpty() ? missing : valid);
        }
        QVERIFY(valid > 20 && missing > 0);
        QCOMPARE(count(db, u"SELECT count(DISTINCT BARCODE) = count(BARCODE) FROM PART WHERE BARCODE <> ''"_s), 1);

        // A server that enforces declared widths must take every text.
        static const QRegularExpression width(u"CHAR\\((\\d+)\\)"_s);
        for (const QString& table : db.tableNames()) {
            QUERY(cols, db, u"PRAGMA table_info(%1)"_s.arg(table));
            for (const QVariantList& col : cols) {
                const auto m = width.match(col[2].toString());
                if (m.hasMatch())
                    QVERIFY2(count(db, u"SELECT max(length(%1)) FROM %2"_s.arg(col[1].toString(), table)) <= m.captured(1).toInt(),
                             qPrintable(table + u'.' + col[1].toString()));
            }
        }
    }

    void repeatable()
    {
        const QString again = m_dir.filePath(u"again.db"_s);
        QFile junk(again);
        QVERIFY(junk.open(QIODevice::WriteOnly) && junk.write("not a database") > 0);
        junk.close();
        QVERIFY(!CreateDemoErp(again, options(2)));
        QFile a(demoPath(2)), b(again);
        QVERIFY(a.open(QIODevice::ReadOnly) && b.open(QIODevice::ReadOnly));
        QVERIFY(a.readAll() == b.readAll());
        QCOMPARE(DemoErpScript(options(1)), DemoErpScript(options(1)));
    }
};

QTEST_GUILESS_MAIN(TestDemoCompany)
#include "tst_democompany.moc"
