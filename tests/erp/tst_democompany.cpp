#include "erp/democompany.h"
#include "erp/textconv.h"

#include <QRegularExpression>
#include <QTemporaryDir>
#include <QtTest>

using namespace tagora;
using namespace Qt::Literals::StringLiterals;

namespace {

const QDate kToday(2024, 2, 29);

struct Rows {
    QStringList columns;
    QList<QVariantList> rows;
    QString error;
    QVariant at(int row, const QString& column) const
    {
        const int c = columns.indexOf(QRegularExpression(u"^"_s + column + u"$"_s, QRegularExpression::CaseInsensitiveOption));
        return c < 0 ? QVariant() : rows[row][c];
    }
    QStringList texts(const QString& column) const
    {
        QStringList out;
        for (int r = 0; r < rows.size(); ++r)
            out << at(r, column).toString();
        return out;
    }
};

// SQLite reads neither #dd/mm/yyyy# nor N'...'; whatever puts an SQLite file
// in the ERP's place rewrites those literals, and so does this.
Rows query(const Database& db, QString sql)
{
    static const QRegularExpression date(u"#(\\d\\d)/(\\d\\d)/(\\d{4})#"_s), national(u"(^|[\\s=(,])N'"_s);
    sql.replace(date, u"'\\3-\\2-\\1'"_s).replace(national, u"\\1'"_s);
    Rows out;
    DbError e;
    Statement s = db.prepare(sql, &e);
    for (int c = 0; c < s.columnCount(); ++c)
        out.columns << s.columnName(c);
    Statement::Step step = Statement::Step::Error;
    while (!e && (step = s.step()) == Statement::Step::Row) {
        out.rows << QVariantList();
        for (int c = 0; c < s.columnCount(); ++c)
            out.rows.last() << s.value(c);
    }
    if (e || step == Statement::Step::Error)
        out.error = (e ? e.message : s.error().message) + u" in: "_s + sql;
    return out;
}

#define QUERY(var, db, sql)                                                                                            \
    const Rows var = query(db, sql);                                                                                   \
    QVERIFY2(var.error.isEmpty(), qPrintable(var.error))

// The item query of the item import, assembled the way the reader does.
QString itemSql(int plist, bool foreign, bool warehouse, const QString& tail = {})
{
    const bool price = plist != 0;
    QString s = u"SELECT PART.PARTNAME, PART.PARTDES, FAMILY.FAMILYNAME, UNIT.UNITNAME, PART.BARCODE"_s;
    s += price ? u", PARTPRICE.PRICE, CURRENCIES.CODE AS CURRCODE"_s : u", 0 AS PRICE, 0 AS CURRCODE"_s;
    s += (foreign ? u", PARTDES.EPARTDES"_s : QString())
        + (warehouse ? u", WAREHOUSES.LOCNAME AS LOCAL"_s : u", 0 AS LOCAL"_s) + u" FROM PART, FAMILY, UNIT"_s
        + (price ? u", PARTPRICE, CURRENCIES"_s : QString()) + (foreign ? u", PARTDES"_s : QString())
        + (warehouse ? u", PARTPARAM, WAREHOUSES"_s : QString())
        + u" WHERE (PART.TYPE = 'R' OR PART.TYPE = 'P') AND FAMILY.FAMILY = PART.FAMILY AND UNIT.UNIT = PART.UNIT"_s
        + (foreign ? u" AND PARTDES.PART = PART.PART"_s : QString());
    if (price)
        s += u" AND PARTPRICE.PART = PART.PART AND PARTPRICE.PLIST = %1 AND CURRENCIES.CURRENCY = PARTPRICE.CURRENCY"_s.arg(plist);
    if (warehouse)
        s += u" AND PARTPARAM.PART = PART.PART AND PARTPARAM.WARHS = WAREHOUSES.WARHS"_s;
    return s + tail + u" Order By PART.PARTNAME"_s;
}

// A document-type recipe of the supplied configuration, and the import's SQL built from it.
struct Recipe {
    int wizFileId = 0;
    bool account = false;
    QVariant vType;
    QString h, l, id, ref1, ref2, date, lineId, docCs, noDraft, cs, csId, csKey, csDesc, merakez;

    QString criteria(bool drafts, const QVariant& from = {}, const QVariant& to = {}, short connType = 2) const
    {
        QString s = vType.isNull() ? QString() : u" AND %1.TYPE = '%2'"_s.arg(h, vType.toString());
        s += u" AND %1.%2 >= 0"_s.arg(h, id);
        if (!from.isNull())
            s += u" And %1.%2 >= %3"_s.arg(h, date, DateToErpLiteral(from, connType));
        if (!to.isNull())
            s += u" And %1.%2 <= %3"_s.arg(h, date, DateToErpLiteral(to, connType));
        return s + (drafts || noDraft.isEmpty() ? QString() : u" And %1.%2"_s.arg(h, noDraft));
    }
    QString count(const QString& crit) const
    {
        return u"SELECT COUNT(%1.%2) As TotalCount FROM %1"_s.arg(h, id)
            + (account ? u", %1 WHERE %1.%2 = %3.%4"_s.arg(cs, csId, h, docCs) : u" WHERE (1 > 0)"_s) + crit;
    }
    QString headers(const QString& crit) const
    {
        const bool mk = account && !merakez.isEmpty();
        QString s = u"SELECT %1.%2 As ID, %1.%3 As DocNumber, %1.%4 As ValueDate, %1.%5 As Reference"_s.arg(h, id, ref1, date, ref2);
        s += account ? u", %1.%2 As AccountKey, %1.%3 As AccountName, %1.ADDRESS As Address, %1.PHONE As Phone"_s.arg(cs, csKey, csDesc)
                     : u", '' As AccountKey"_s;
        s += u", %1.DETAILS"_s.arg(h);
        if (account)
            s += mk ? u", MERAKEZ.%1 As AssignKey"_s.arg(csKey) : u", '' As AssignKey"_s;
        s += u" FROM "_s + h + (account ? u", "_s + cs : QString()) + (mk ? u", %1 MERAKEZ"_s.arg(cs) : QString());
        s += u" WHERE %1.%2 > 0"_s.arg(h, id) + (account ? u" AND %1.%2 = %3.%4"_s.arg(cs, csId, h, docCs) : QString());
        return s + (mk ? u" And MERAKEZ.%1 = %2.%3"_s.arg(csId, cs, merakez) : QString()) + crit;
    }
    QString lines(const QVariant& doc) const
    {
        return u"SELECT %1.%2 As StockID,%1.%3 As ID,%1.LINE, PART.PARTNAME As ItemKey, PART.PARTDES As ItemName"
               ",%1.QUANT As Quantity,%1.TQUANT As TQuantity FROM %1, PART WHERE PART.PART = %1.PART"
               " AND %1.%2 = %4 ORDER BY %1.LINE"_s.arg(l, id, lineId, doc.toString());
    }
    QString packages(const QVariant& doc) const
    {
        const QString ext = wizFileId == 2 ? u"ORDERITEMSA"_s : wizFileId == 3 ? u"PORDERITEMSA"_s
                          : wizFileId == 4 ? u"TRANSORDER"_s : QString();
        const QString join = wizFileId == 4 ? u" AND EX.DOC=L.IV AND EX.LINE=L.LINE"_s : u" AND EX.ORDI=L.ORDI"_s;
        return u"SELECT L.%1 As StockID, L.%2 As ID, L.LINE"_s.arg(id, lineId)
            + (ext.isEmpty() ? u", L.NUMPACK As Packs"_s : u", EX.NUMPACK As Packs"_s) + u" FROM %1 L"_s.arg(l)
            + (ext.isEmpty() ? QString() : u", %1 EX"_s.arg(ext)) + u" WHERE L.%1 > 0 AND L.%1 = %2"_s.arg(id, doc.toString())
            + (ext.isEmpty() ? QString() : join) + u" ORDER BY L.LINE"_s;
    }
    QString itemsOnDocs(const QString& crit) const
    {
        return u" And PART.PART In (SELECT DISTINCT %2.PART FROM %1, %2 WHERE %2.%3 = %1.%3%4)"_s.arg(h, l, id, crit);
    }
};

} // namespace

class TestDemoCompany : public QObject {
    Q_OBJECT

    QTemporaryDir m_dir;
    std::vector<Recipe> m_recipes;

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
        // The recipes as the supplied configuration carries them, so the two never drift apart.
        const QString config = m_dir.filePath(u"tagora.tdb"_s);
        QVERIFY(QFile::copy(u":/tagora/tagora.tdb"_s, config));
        Database db;
        QVERIFY(!db.open(config, Database::OpenMode::ReadOnly));
        QUERY(rs, db, u"SELECT d.WizFileID, d.CSTableID IN (1, 2), d.vTYPE, w.HeadTable, w.LineTable, w.fldID, w.fldRef1,"
                      " w.fldRef2, w.fldDate, w.fldLineID, w.fldDocCSID, w.NoDraft, c.CSTableName, c.fldCSID, c.fldCSKey,"
                      " c.fldCSDesc, c.fldMerakezID FROM tDocTypes d JOIN tCSTable c ON c.CSTableID = d.CSTableID"
                      " JOIN tWizFiles w ON w.WizFileID = d.WizFileID ORDER BY d.DocType"_s);
        for (const QVariantList& row : rs.rows) {
            Recipe r{row[0].toInt(), row[1].toBool(), row[2]};
            QString* texts[] = {&r.h, &r.l, &r.id, &r.ref1, &r.ref2, &r.date, &r.lineId, &r.docCs,
                                &r.noDraft, &r.cs, &r.csId, &r.csKey, &r.csDesc, &r.merakez};
            for (int i = 0; i < 14; ++i)
                *texts[i] = row[3 + i].toString();
            m_recipes.push_back(r);
        }
        QCOMPARE(m_recipes.size(), size_t(6));
    }

    void itemQuery_data()
    {
        QTest::addColumn<int>("connType");
        QTest::addColumn<int>("items");
        QTest::addColumn<int>("plist");
        QTest::addColumn<bool>("joins"); // foreign names and warehouses
        for (int t : {1, 2}) {
            QTest::addRow("type %d plain", t) << t << 40 << 0 << false;
            QTest::addRow("type %d 500 items, foreign and warehouse", t) << t << 500 << 0 << true;
            QTest::addRow("type %d base list", t) << t << 40 << 1 << false;
            QTest::addRow("type %d dollar list", t) << t << 40 << 3 << false;
            QTest::addRow("type %d list with empty code", t) << t << 40 << 4 << true;
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
        QUERY(rs, db, itemSql(plist, joins, joins));
        QUERY(others, db, u"SELECT PARTNAME FROM PART WHERE TYPE NOT IN ('R', 'P')"_s);
        QVERIFY(!others.rows.isEmpty());
        const QStringList keys = rs.texts(u"PARTNAME"_s);
        for (const QString& other : others.texts(u"PARTNAME"_s))
            QVERIFY2(!keys.contains(other), qPrintable(other));
        setErpConnType(short(connType));
        const QStringList codes = rs.texts(u"CURRCODE"_s);
        switch (plist) {
        case 0: // every R/P item joins its family, unit, foreign name and warehouse
            QCOMPARE(rs.rows.size(), items);
            for (const QString& key : {u"AB\"12"_s, u"O'R-5"_s, u" LEAD-7"_s, u"TRAIL-8 "_s, u"   "_s})
                QVERIFY2(keys.contains(key), qPrintable(key));
            break;
        case 1: QCOMPARE(ConvertErpText(codes.first(), {}), u"ש\"ח"_s); break;
        case 3: QCOMPARE(codes.count(u"$"_s), codes.size()); break;
        case 4: QVERIFY(codes.contains(QString())); break;
        }
        QVERIFY(rs.rows.size() <= items);
    }

    void itemReaders_data() { connTypes(); }
    void itemReaders()
    {
        QFETCH(int, connType);
        Database db;
        QVERIFY(!db.open(demoPath(connType), Database::OpenMode::ReadOnly));
        QUERY(range, db, itemSql(0, false, false, u" And PART.FAMILYNAME >= '200' And PART.FAMILYNAME <= '400'"_s));
        QVERIFY(!range.rows.isEmpty());
        for (const QString& f : range.texts(u"FAMILYNAME"_s))
            QVERIFY(f >= "200"_L1 && f <= "400"_L1);

        // Part numbers: an account and item given twice, an empty number.
        for (const QString& alt : {u"CUSTOMERS.CUSTNAME, PART.PARTNAME, CUSTPART.CUSTPARTNAME FROM CUSTOMERS, CUSTPART, PART"
                                   " WHERE CUSTOMERS.CUST = CUSTPART.CUST AND PART.PART = CUSTPART.PART"_s,
                                   u"SUPPLIERS.SUPNAME, PART.PARTNAME, SUPPART.SUPPARTNAME FROM SUPPLIERS, SUPPART, PART"
                                   " WHERE SUPPLIERS.SUP = SUPPART.SUP AND PART.PART = SUPPART.PART"_s}) {
            QUERY(rs, db, u"SELECT "_s + alt);
            QSet<QString> pairs;
            for (const QVariantList& row : rs.rows)
                pairs.insert(row[0].toString() + QChar(0) + row[1].toString());
            QVERIFY(pairs.size() < rs.rows.size());
            QVERIFY(rs.texts(rs.columns[2]).contains(QString()));
        }

        QUERY(lists, db, u"SELECT PARTPRICE.PLIST, PART.PARTNAME, PARTPRICE.PRICE, CURRENCIES.CODE FROM CURRENCIES, PARTPRICE,"
                         " PART, FAMILY WHERE (PART.TYPE = 'R' OR PART.TYPE = 'P') AND CURRENCIES.CURRENCY = PARTPRICE.CURRENCY"
                         " AND PARTPRICE.PART = PART.PART AND FAMILY.FAMILY = PART.FAMILY ORDER BY PARTPRICE.PLIST, PART.PARTNAME"_s);
        for (const QString& n : {u"-50"_s, u"0"_s, u"1"_s, u"2"_s, u"3"_s, u"4"_s})
            QVERIFY2(lists.texts(u"PLIST"_s).contains(n), qPrintable(n));
        QVERIFY(lists.texts(u"CODE"_s).contains(QString()));
        QVERIFY(lists.texts(u"PRICE"_s).contains(QString())); // a null price

        QUERY(count, db, u"SELECT Count(PLIST) As ItemCount FROM PRICELIST WHERE PLIST <> 0"_s);
        QCOMPARE(count.at(0, u"ItemCount"_s).toInt(), 5);
        // List 0 has neither name nor description ("no price list"); one real list has only a name.
        QUERY(field, db, u"SELECT PL.PLIST, PL.PLNAME, PL.PLDES FROM PRICELIST PL WHERE PL.PLIST <> -50"_s);
        QStringList shown;
        for (const QVariantList& row : field.rows)
            shown << u"%1:%2"_s.arg(row[0].toInt()).arg(row[2].toString().isEmpty() ? row[1].toString() : u"-"_s);
        QVERIFY(shown.contains(u"0:"_s));
        QCOMPARE(shown.filter(QRegularExpression(u"^[1-9]\\d*:(?!-$)."_s)).size(), 1);
    }

    void specialPrices_data() { connTypes(); }
    void specialPrices()
    {
        QFETCH(int, connType);
        Database db;
        QVERIFY(!db.open(demoPath(connType), Database::OpenMode::ReadOnly));
        QUERY(valid, db, u"SELECT CUSTOMERS.CUSTNAME As AccountKey, PART.PARTNAME As ItemKey, CUSTPARTPRICE.PRICE,"
                         " CURRENCIES.CODE As CurrencyCode FROM CUSTOMERS, CUSTPARTPRICE, PART, CURRENCIES"
                         " WHERE CUSTOMERS.CUST = CUSTPARTPRICE.CUST AND PART.PART = CUSTPARTPRICE.PART"
                         " AND CURRENCIES.CURRENCY = CUSTPARTPRICE.CURRENCY AND CUSTPARTPRICE.EXPIRYDATE >= %1"
                         " AND CUSTPARTPRICE.FROMDATE <= %1"_s.arg(DateToErpLiteral(QDate(kToday), short(connType))));
        QUERY(all, db, u"SELECT FROMDATE, EXPIRYDATE FROM CUSTPARTPRICE"_s);
        int expected = 0;
        QSet<QString> kinds;
        for (const QVariantList& row : all.rows) {
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
        QCOMPARE(valid.rows.size(), expected);
        QVERIFY(valid.texts(u"CurrencyCode"_s).contains(QString()));
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
        const Recipe& r = m_recipes[size_t(recipe)];
        Database db;
        QVERIFY(!db.open(demoPath(connType), Database::OpenMode::ReadOnly));
        const QString crit = r.criteria(false);
        QUERY(count, db, r.count(crit));
        const int total = count.at(0, u"TotalCount"_s).toInt();
        QVERIFY(total > 0);
        QUERY(heads, db, r.headers(crit));
        QCOMPARE(heads.rows.size(), total); // the consolidating-account join loses no document
        if (!r.noDraft.isEmpty()) {
            QUERY(withDrafts, db, r.count(r.criteria(true)));
            QVERIFY(withDrafts.at(0, u"TotalCount"_s).toInt() > total);
        }
        bool consolidated = false, packages = false;
        for (int h = 0; h < heads.rows.size(); ++h) {
            const QString key = heads.at(h, u"AccountKey"_s).toString();
            QVERIFY(!r.account || !key.trimmed().isEmpty());
            consolidated |= heads.at(h, u"AssignKey"_s).toString() != key;
            QUERY(lines, db, r.lines(heads.at(h, u"ID"_s)));
            QVERIFY(!lines.rows.isEmpty());
            for (int l = 0; l < lines.rows.size(); ++l)
                QCOMPARE(lines.at(l, u"LINE"_s).toInt(), l + 1);
            QUERY(packs, db, r.packages(heads.at(h, u"ID"_s)));
            packages |= !packs.rows.isEmpty();
        }
        QVERIFY(packages);
        QVERIFY(consolidated || r.merakez.isEmpty());

        // The date bounds of the import select by the stored dates of either kind.
        QUERY(month, db, r.count(r.criteria(true, kToday.addDays(-30), kToday, short(connType))));
        QVERIFY(month.at(0, u"TotalCount"_s).toInt() > 0);
        QUERY(future, db, r.count(r.criteria(true, kToday.addDays(1), {}, short(connType))));
        QCOMPARE(future.at(0, u"TotalCount"_s).toInt(), 0);

        QUERY(items, db, itemSql(0, false, false, r.itemsOnDocs(crit)));
        QVERIFY(!items.rows.isEmpty() && items.rows.size() <= 40);
    }

    void documentLines()
    {
        Database db;
        QVERIFY(!db.open(demoPath(2), Database::OpenMode::ReadOnly));
        QUERY(ranges, db, u"SELECT (SELECT max(DOC) FROM DOCUMENTS) < (SELECT min(IV) FROM INVOICES)"_s);
        QCOMPARE(ranges.rows[0][0].toInt(), 1);
        for (const QString& table : {u"ORDERITEMS"_s, u"PORDERITEMS"_s, u"INVOICEITEMS"_s, u"TRANSORDER"_s}) {
            QUERY(kinds, db, u"SELECT sum(QUANT = 0), sum(QUANT <> round(QUANT)), sum(QUANT > 1000), sum(QUANT < 0),"
                             " sum(TQUANT IS NULL), sum(trim(PARTNAME) = '') FROM %1 L, PART WHERE PART.PART = L.PART"_s.arg(table));
            for (int c = 0; c < 6; ++c)
                QVERIFY2(kinds.rows[0][c].toInt() > 0 || (c == 5 && table == "PORDERITEMS"_L1), qPrintable(table + QString::number(c)));
        }
    }

    void labelLists_data() { connTypes(); }
    void labelLists()
    {
        QFETCH(int, connType);
        Database db;
        QVERIFY(!db.open(demoPath(connType), Database::OpenMode::ReadOnly));
        QUERY(users, db, u"SELECT USERLOGIN, USER FROM USERS WHERE USER > 0"_s);
        QVERIFY(users.texts(u"USERLOGIN"_s).contains(QString()) && !users.texts(u"USER"_s).contains(u"0"_s));
        QUERY(defs, db, u"SELECT LABELDEF, LABELNAME, LABELPATH FROM LABELSDEF"_s);
        QVERIFY(defs.texts(u"LABELPATH"_s).contains(QString()));
        QUERY(count, db, u"SELECT Count(KLine) As ItemCount FROM LABELS WHERE USER = 1"_s);
        QUERY(lines, db, u"SELECT * FROM LABELS WHERE USER = 1 ORDER BY KLINE"_s);
        QVERIFY(!lines.rows.isEmpty());
        QCOMPARE(lines.rows.size(), count.at(0, u"ItemCount"_s).toInt());
        for (const QString& c : {u"KLINE"_s, u"LABELQUANT"_s, u"LABELDEF"_s, u"Sort"_s, u"PAR1"_s, u"PAR20"_s})
            QVERIFY2(lines.columns.contains(c, Qt::CaseInsensitive), qPrintable(c));

        DemoOptions o = options(connType);
        o.labelLists = false;
        const QString path = m_dir.filePath(u"nolabels.db"_s);
        QVERIFY(!CreateDemoErp(path, o));
        Database bare;
        QVERIFY(!bare.open(path, Database::OpenMode::ReadOnly));
        QVERIFY(bare.hasTable(u"PART"_s));
        for (const QString& t : {u"USERS"_s, u"LABELSDEF"_s, u"LABELS"_s})
            QVERIFY2(!bare.hasTable(t), qPrintable(t));
    }

    void itemCard_data() { connTypes(); }
    void itemCard()
    {
        QFETCH(int, connType);
        Database db;
        QVERIFY(!db.open(demoPath(connType), Database::OpenMode::ReadOnly));
        const QString code = (connType == 2 ? u"N"_s : QString()) + u"'O''R-5'"_s;
        QUERY(item, db, u"SELECT PART.PART, PART.PARTNAME AS ItemKey, PART.PARTDES As ItemName, FAMILY.FAMILYNAME As SortGroup,"
                        " FAMILY.FAMILYDES As SortCodeName, UNIT.UNITNAME As Unit, PART.BARCODE, PARTDES.EPARTDES As ForignName,"
                        " SUPPLIERS.SUPDES FROM PART, FAMILY, UNIT, PARTDES, PARTPARAM, SUPPLIERS WHERE PART.PARTNAME =%1"
                        " AND (PART.TYPE = 'R' OR PART.TYPE = 'P') AND FAMILY.FAMILY = PART.FAMILY AND UNIT.UNIT = PART.UNIT"
                        " AND PARTDES.PART = PART.PART AND PARTPARAM.PART = PART.PART AND SUPPLIERS.SUP = PARTPARAM.SUP"_s.arg(code));
        QCOMPARE(item.rows.size(), 1);
        const QString id = item.at(0, u"PART"_s).toString();
        const QString today = DateToErpLiteral(QDate(kToday), short(connType));
        QUERY(picture, db, u"SELECT PEF.EXTFILENAME FROM PARTEXTFILE PEF WHERE PEF.PART = %1 AND PEF.EXTFILENUM = -1"_s.arg(id));
        QVERIFY(picture.at(0, u"EXTFILENAME"_s).toString().startsWith(".."_L1));
        QUERY(types, db, u"SELECT PST.NUMBER, PST.SPECDES FROM PARTSPECTYPES PST WHERE PST.NUMBER > 0 ORDER BY PST.NUMBER"_s);
        QVERIFY(types.texts(u"SPECDES"_s).contains(QString()));
        // The property columns the card reads: one per property type number.
        const QStringList propertyColumns = {u"PS.SPEC1"_s, u"PS.SPEC2"_s, u"PS.SPEC3"_s, u"PS.SPEC4"_s, u"PS.SPEC5"_s,
                                             u"PS.SPEC6"_s, u"PS.SPEC7"_s, u"PS.SPEC8"_s, u"PS.SPEC9"_s, u"PS.SPEC10"_s};
        QStringList wanted;
        for (const QString& number : types.texts(u"NUMBER"_s))
            wanted << propertyColumns.value(number.toInt() - 1);
        for (const QString& sql :
             {u"SELECT PS.PART, %2 FROM PARTSPEC PS WHERE PS.PART = %1"_s.arg(id, wanted.join(u", "_s)),
              u"SELECT C.CUSTNAME As AccountKey, C.CUSTDES As FullName, CPP.PRICE, CR.CODE As CurrencyCode FROM CUSTOMERS C,"
              " CUSTPARTPRICE CPP, CURRENCIES CR WHERE CPP.PART = %1 AND CPP.EXPIRYDATE >= %2 AND CPP.FROMDATE <= %2"
              " AND C.CUST = CPP.CUST AND CR.CURRENCY = CPP.CURRENCY ORDER BY C.CUSTNAME"_s.arg(id, today),
              u"SELECT ALTP.PARTNAME AS AlterItem, ALTP.PARTDES As AlterName, PARNTP.PARTNAME AS ParItem, PARNTP.PARTDES As ParName"
              " FROM PARTALT PA, PART ALTP, PART PARNTP WHERE PA.PART = %1 AND ALTP.PART = PA.ALT AND PARNTP.PART = PA.PARENT"
              " ORDER BY PA.LN"_s.arg(id)}) {
            QUERY(rs, db, sql);
            QVERIFY2(!rs.rows.isEmpty(), qPrintable(sql));
        }
        // The product tree holds components out of date as well as current ones.
        QUERY(tree, db, u"SELECT P.PARTNAME AS ItemKey, P.PARTDES AS ItemName, PA.COEF AS Quantity, PA.SONQUANT FROM PARTARC PA,"
                        " PART P WHERE PA.PART = %1 AND P.PART = PA.SON AND PA.TILLDATE >= %2 AND PA.FROMDATE <= %2"
                        " ORDER BY P.PARTNAME"_s.arg(id, today));
        QUERY(allTree, db, u"SELECT * FROM PARTARC WHERE PART = %1"_s.arg(id));
        QVERIFY(!tree.rows.isEmpty() && tree.rows.size() < allTree.rows.size());
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
            QCOMPARE(v.rows.size(), l.rows.size());
            for (int r = 0; r < l.rows.size(); ++r) {
                for (int c = 0; c < l.columns.size(); ++c) {
                    const QVariant &a = v.rows[r][c], &b = l.rows[r][c];
                    const QByteArray where = (table + u'.' + l.columns[c] + u' ' + b.toString()).toUtf8();
                    if (a.isNull() || b.isNull()) {
                        QVERIFY2(a.isNull() && b.isNull(), where);
                    } else if (declared.rows[c][2].toString() == "DATE"_L1) {
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
        for (const QString& code : codes.texts(u"BARCODE"_s)) {
            int sum = 0;
            for (int i = 0; i < code.size(); ++i)
                sum += code[i].digitValue() * (i % 2 ? 3 : 1);
            QVERIFY2(code.isEmpty() || (ean13.match(code).hasMatch() && sum % 10 == 0), qPrintable(code));
            ++(code.isEmpty() ? missing : valid);
        }
        QVERIFY(valid > 20 && missing > 0);
        QUERY(unique, db, u"SELECT count(DISTINCT BARCODE) = count(BARCODE) FROM PART WHERE BARCODE <> ''"_s);
        QCOMPARE(unique.rows[0][0].toInt(), 1);

        // A server that enforces declared widths must take every text.
        static const QRegularExpression width(u"CHAR\\((\\d+)\\)"_s);
        for (const QString& table : db.tableNames()) {
            QUERY(cols, db, u"PRAGMA table_info(%1)"_s.arg(table));
            for (const QVariantList& col : cols.rows) {
                const auto m = width.match(col[2].toString());
                if (!m.hasMatch())
                    continue;
                QUERY(longest, db, u"SELECT max(length(%1)) FROM %2"_s.arg(col[1].toString(), table));
                QVERIFY2(longest.rows[0][0].toInt() <= m.captured(1).toInt(), qPrintable(table + u'.' + col[1].toString()));
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

    void script_data() { connTypes(); }
    void script()
    {
        QFETCH(int, connType);
        const QString sql = DemoErpScript(options(connType));
        Database db;
        QVERIFY(!db.open(demoPath(connType), Database::OpenMode::ReadOnly));
        for (const QString& table : db.tableNames())
            QVERIFY2(sql.contains(u"CREATE TABLE %1 ("_s.arg(table)) && sql.contains(u"INSERT INTO %1 ("_s.arg(table)),
                     qPrintable(table));
        QVERIFY(sql.contains("'O''R-5'"_L1) && sql.trimmed().endsWith("COMMIT;"_L1));
        QVERIFY(sql.contains(connType == 1 ? u"'%1'"_s.arg(kToday.toString(Qt::ISODate))
                                           : QString::number(QDate(1988, 1, 1).daysTo(kToday) * 1440)));
    }
};

QTEST_GUILESS_MAIN(TestDemoCompany)
#include "tst_democompany.moc"
