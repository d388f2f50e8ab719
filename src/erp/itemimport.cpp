#include "erp/itemimport.h"

#include "erp/odbc.h"
#include "erp/textconv.h"
#include "localdb/database.h"
#include "platform/progress.h"

namespace tagora {

namespace {
constexpr int kItemTimeout = 120;
constexpr int kOtherTimeout = 60;
constexpr int kPriceFieldTimeout = 30;

// An ERP key as the local tables keep it: trimmed, double quotes made
// apostrophes, converted from visual order. Empty means "skip the row".
QString localKey(const QVariant& value)
{
    const QString trimmed = NullTrim(value);
    if (trimmed.isEmpty())
        return QString();
    return ConvertErpText(QuoteToApostrophe(trimmed), QString());
}

// The frame every reader shares: connection, query, count, local database,
// one transaction, progress, and the end that keeps what was written.
class ReaderRun {
public:
    // titlePrefix starts the title of a failure; the row's key completes it.
    ReaderRun(const ErpReadContext& ctx, const QString& status, const QString& titlePrefix, int timeout,
              int progressEvery = 5)
        : m_ctx(ctx)
        , m_title(titlePrefix)
        , m_timeout(ctx.timeout > 0 ? ctx.timeout : timeout)
        , m_every(progressEvery)
    {
        report(0);
        if (m_ctx.progress && !status.isEmpty())
            m_ctx.progress->setMessage(status);
    }

    ~ReaderRun() { report(0); }

    // Opens the local database and the ERP query; false with the error set.
    bool start(const QString& dbPath, const ErpQuery& q, ReadError* error, bool count = true)
    {
        DbError e = m_db.open(dbPath);
        if (!e)
            e = m_db.begin();
        if (e)
            return fail(error, QString(), e.message);
        QString message;
        if (!m_erp.open(m_ctx.connString, m_timeout, &message))
            return fail(error, QString(), message);
        if (count)
            m_count = m_erp.countRows(q.sql, q.params);
        m_rs = m_erp.query(q, &message);
        if (!m_rs)
            return fail(error, QString(), message);
        return true;
    }

    Statement prepare(const QString& sql, ReadError* error)
    {
        DbError e;
        Statement s = m_db.prepare(sql, &e);
        if (e)
            fail(error, QString(), e.message);
        return s;
    }

    ErpRecordset& rs() { return *m_rs; }
    Database& db() { return m_db; }

    // After each row: progress every few rows.
    void rowDone()
    {
        ++m_row;
        if (m_count > 0 && m_row % m_every == 0)
            report(double(m_row) / double(m_count));
    }

    // Keeps what was written, whatever came before.
    bool finish(ReadError* error)
    {
        if (m_rs && m_rs->failed())
            return fail(error, QString(), m_rs->error());
        if (m_db.inTransaction())
            if (DbError e = m_db.commit())
                return fail(error, QString(), e.message);
        return true;
    }

    // From here on a failure keeps nothing of this run: the reader replaces a
    // table, and half a replacement is worse than the old rows.
    void allOrNothing() { m_allOrNothing = true; }

    bool fail(ReadError* error, const QString& title, const QString& message)
    {
        if (m_db.inTransaction()) {
            if (m_allOrNothing)
                m_db.rollback();
            else
                m_db.commit();
        }
        if (error)
            *error = {title.isEmpty() ? m_title : title, message};
        return false;
    }

private:
    void report(double fraction)
    {
        if (m_ctx.progress)
            m_ctx.progress->setProgress(fraction);
    }

    const ErpReadContext& m_ctx;
    QString m_title;
    int m_timeout;
    int m_every;
    Database m_db;
    ErpConnection m_erp;
    std::unique_ptr<ErpRecordset> m_rs;
    long long m_count = -1;
    long long m_row = 0;
    bool m_allOrNothing = false;
};

// Runs an insert for one row: a duplicate key is skipped, any other error stops.
bool insertRow(Statement& s, ReaderRun& run, ReadError* error, const QString& title)
{
    const DbError e = s.run();
    s.clearBindings();
    if (!e || e.isDuplicateKey())
        return true;
    return run.fail(error, title, e.message);
}
} // namespace

ErpQuery familyRangeSql(const QString& fromSort, const QString& toSort)
{
    ErpQuery r;
    if (!fromSort.isEmpty()) {
        r.sql += QStringLiteral(" And PART.FAMILYNAME >= ?");
        r.params << fromSort;
    }
    if (!toSort.isEmpty()) {
        r.sql += QStringLiteral(" And PART.FAMILYNAME <= ?");
        r.params << toSort;
    }
    return r;
}

namespace {
// The family range, then the restriction to the documents' items, then the order.
ErpQuery withRange(ErpQuery q, const QString& fromSort, const QString& toSort, const QString& docCriteria,
                   const QString& orderBy)
{
    const ErpQuery range = familyRangeSql(fromSort, toSort);
    q.sql += range.sql + docCriteria + orderBy;
    q.params += range.params;
    return q;
}
} // namespace

ErpQuery itemQuerySql(const QString& fromSort, const QString& toSort, bool foreignNames, int priceList,
                      bool withWarehouse, const QString& docCriteria)
{
    const bool p = priceList != 0;
    ErpQuery q;
    QString& sql = q.sql;
    sql = QStringLiteral("SELECT PART.PARTNAME, PART.PARTDES, FAMILY.FAMILYNAME, UNIT.UNITNAME, PART.BARCODE");
    sql += p ? QStringLiteral(", PARTPRICE.PRICE, CURRENCIES.CODE AS CURRCODE") : QStringLiteral(", 0 AS PRICE, 0 AS CURRCODE");
    if (foreignNames)
        sql += QStringLiteral(", PARTDES.EPARTDES");
    sql += withWarehouse ? QStringLiteral(", WAREHOUSES.LOCNAME AS LOCAL") : QStringLiteral(", 0 AS LOCAL");
    sql += QStringLiteral(" FROM PART, FAMILY, UNIT");
    if (p)
        sql += QStringLiteral(", PARTPRICE, CURRENCIES");
    if (foreignNames)
        sql += QStringLiteral(", PARTDES");
    if (withWarehouse)
        sql += QStringLiteral(", PARTPARAM, WAREHOUSES");
    sql += QStringLiteral(" WHERE (PART.TYPE = 'R' OR PART.TYPE = 'P') AND FAMILY.FAMILY = PART.FAMILY"
                          " AND UNIT.UNIT = PART.UNIT");
    if (foreignNames)
        sql += QStringLiteral(" AND PARTDES.PART = PART.PART");
    if (p) {
        sql += QStringLiteral(" AND PARTPRICE.PART = PART.PART AND PARTPRICE.PLIST = ?"
                              " AND CURRENCIES.CURRENCY = PARTPRICE.CURRENCY");
        q.params << priceList;
    }
    if (withWarehouse)
        sql += QStringLiteral(" AND PARTPARAM.PART = PART.PART AND PARTPARAM.WARHS = WAREHOUSES.WARHS");
    return withRange(q, fromSort, toSort, docCriteria, QStringLiteral(" Order By PART.PARTNAME"));
}

ErpQuery foreignNameQuerySql(const QString& fromSort, const QString& toSort, const QString& docCriteria)
{
    return withRange({QStringLiteral("SELECT PART.PARTNAME, PARTDES.EPARTDES FROM PART, FAMILY, PARTDES"
                                     " WHERE (PART.TYPE = 'R' OR PART.TYPE = 'P') AND FAMILY.FAMILY = PART.FAMILY"
                                     " AND PARTDES.PART = PART.PART"),
                      {}},
                     fromSort, toSort, docCriteria, QStringLiteral(" Order By PART.PARTNAME"));
}

ErpQuery alterKeyQuerySql(bool suppliers, const QString& docCriteria)
{
    if (suppliers)
        return {QStringLiteral("SELECT SUPPLIERS.SUPNAME, PART.PARTNAME, SUPPART.SUPPARTNAME"
                               " FROM SUPPLIERS, SUPPART, PART WHERE SUPPLIERS.SUP = SUPPART.SUP"
                               " AND PART.PART = SUPPART.PART")
                    + docCriteria,
                {}};
    return {QStringLiteral("SELECT CUSTOMERS.CUSTNAME, PART.PARTNAME, CUSTPART.CUSTPARTNAME"
                           " FROM CUSTOMERS, CUSTPART, PART WHERE CUSTOMERS.CUST = CUSTPART.CUST"
                           " AND PART.PART = CUSTPART.PART")
                + docCriteria,
            {}};
}

ErpQuery alterPriceQuerySql(const QVariant& today, const QString& docCriteria)
{
    return {QStringLiteral("SELECT CUSTOMERS.CUSTNAME As AccountKey, PART.PARTNAME As ItemKey"
                           ", CUSTPARTPRICE.PRICE, CURRENCIES.CODE As CurrencyCode"
                           " FROM CUSTOMERS, CUSTPARTPRICE, PART, CURRENCIES"
                           " WHERE CUSTOMERS.CUST = CUSTPARTPRICE.CUST AND PART.PART = CUSTPARTPRICE.PART"
                           " AND CURRENCIES.CURRENCY = CUSTPARTPRICE.CURRENCY"
                           " AND CUSTPARTPRICE.EXPIRYDATE >= ? AND CUSTPARTPRICE.FROMDATE <= ?")
                + docCriteria,
            {today, today}};
}

ErpQuery priceListQuerySql(const QString& fromSort, const QString& toSort, const QString& docCriteria)
{
    return withRange({QStringLiteral("SELECT PARTPRICE.PLIST, PART.PARTNAME, PARTPRICE.PRICE, CURRENCIES.CODE"
                                     " FROM CURRENCIES, PARTPRICE, PART, FAMILY"
                                     " WHERE (PART.TYPE = 'R' OR PART.TYPE = 'P') AND CURRENCIES.CURRENCY = PARTPRICE.CURRENCY"
                                     " AND PARTPRICE.PART = PART.PART AND FAMILY.FAMILY = PART.FAMILY"),
                      {}},
                     fromSort, toSort, docCriteria, QStringLiteral(" ORDER BY PARTPRICE.PLIST, PART.PARTNAME"));
}

bool ReadItemPriority(const ErpReadContext& ctx, const QString& dbPath, const QString& fromSort,
                      const QString& toSort, bool foreignNames, short copies, int priceList, bool byDocs,
                      bool withWarehouse, ReadError* error, bool replaceAll)
{
    ReaderRun run(ctx, QStringLiteral("קורא פריטים"), QStringLiteral("Error reading item: "), kItemTimeout);
    const ErpQuery sql = itemQuerySql(fromSort, toSort, foreignNames, priceList, withWarehouse,
                                     byDocs ? ctx.itemByDocCriteria : QString());
    if (!run.start(dbPath, sql, error))
        return false;
    // Found by key and updated, or added; a field the ERP leaves empty keeps
    // what an existing row had (NULL here means "not written").
    Statement upsert = run.prepare(
        QStringLiteral(
            "INSERT INTO tItems (ItemKey, VNItemName, ItemName, ItemSort, Unit, BarCode, Price, Coin, Copies, PurPackUN, Local)"
            " VALUES (?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9, 1, ?10)"
            " ON CONFLICT (ItemKey) DO UPDATE SET VNItemName = coalesce(excluded.VNItemName, VNItemName),"
            " ItemName = coalesce(excluded.ItemName, ItemName), ItemSort = excluded.ItemSort,"
            " Unit = coalesce(excluded.Unit, Unit), BarCode = coalesce(excluded.BarCode, BarCode),"
            " Price = excluded.Price, Coin = excluded.Coin, Copies = excluded.Copies, PurPackUN = 1,"
            " Local = coalesce(excluded.Local, Local)"),
        error);
    if (!upsert.isValid())
        return false;
    // Emptied in the transaction that refills it, so until the last row is in
    // the old items and their marks are what a crash or an error leaves.
    if (replaceAll) {
        run.allOrNothing();
        if (const DbError e = run.db().exec(QStringLiteral("DELETE FROM tItems")))
            return run.fail(error, QString(), e.message);
    }
    ErpRecordset& rs = run.rs();
    const int cName = rs.columnIndex(QStringLiteral("PARTNAME")), cDes = rs.columnIndex(QStringLiteral("PARTDES"));
    const int cFamily = rs.columnIndex(QStringLiteral("FAMILYNAME")), cUnit = rs.columnIndex(QStringLiteral("UNITNAME"));
    const int cBar = rs.columnIndex(QStringLiteral("BARCODE")), cPrice = rs.columnIndex(QStringLiteral("PRICE"));
    const int cCurr = rs.columnIndex(QStringLiteral("CURRCODE")), cLocal = rs.columnIndex(QStringLiteral("LOCAL"));
    const int cForeign = rs.columnIndex(QStringLiteral("EPARTDES"));
    auto orNull = [](const QString& s) { return s.isEmpty() ? QVariant() : QVariant(s); };
    while (rs.next()) {
        const QString key = localKey(rs.value(cName));
        if (!key.isEmpty()) {
            const QString des = NullTrim(rs.value(cDes));
            upsert.bind(1, key);
            upsert.bind(2, des.isEmpty() ? QVariant() : QVariant(ReverseForCells(des)));
            if (foreignNames)
                upsert.bind(3, orNull(NullTrim(rs.value(cForeign))));
            else
                upsert.bind(3, des.isEmpty() ? QVariant() : QVariant(ConvertErpText(des, QString())));
            const QVariant family = rs.value(cFamily);
            upsert.bind(4, family.isNull() ? QVariant() : QVariant(family.toString()));
            upsert.bind(5, orNull(ConvertErpText(NullTrim(rs.value(cUnit)), QString())));
            upsert.bind(6, orNull(ConvertErpText(NullTrim(rs.value(cBar)), QString())));
            const QVariant price = rs.value(cPrice);
            const bool priced = priceList != 0 && !price.isNull();
            upsert.bind(7, priced ? NullToDouble(price) : 0.0);
            const QString code = priced ? ConvertErpText(NullTrim(rs.value(cCurr)), QString()) : QString();
            upsert.bind(8, code.isEmpty() ? QStringLiteral("$") : code);
            upsert.bind(9, copies);
            upsert.bind(10, orNull(NullTrim(rs.value(cLocal))));
            if (!insertRow(upsert, run, error, QStringLiteral("Error reading item: ") + key))
                return false;
        }
        run.rowDone();
    }
    return run.finish(error);
}

bool ReadItemFName(const ErpReadContext& ctx, const QString& dbPath, const QString& fromSort, const QString& toSort,
                   bool byDocs, ReadError* error)
{
    ReaderRun run(ctx, QStringLiteral("קורא תאורים לועזיים"), QStringLiteral("Error reading item: "), kItemTimeout);
    if (!run.start(dbPath, foreignNameQuerySql(fromSort, toSort, byDocs ? ctx.itemByDocCriteria : QString()), error))
        return false;
    Statement update = run.prepare(QStringLiteral("UPDATE tItems SET Fname = ?2 WHERE ItemKey = ?1"), error);
    if (!update.isValid())
        return false;
    ErpRecordset& rs = run.rs();
    const int cName = rs.columnIndex(QStringLiteral("PARTNAME")), cForeign = rs.columnIndex(QStringLiteral("EPARTDES"));
    while (rs.next()) {
        const QString key = localKey(rs.value(cName));
        const QString foreign = NullTrim(rs.value(cForeign));
        if (!key.isEmpty() && !foreign.isEmpty()) {
            update.bind(1, key);
            update.bind(2, foreign);
            if (!insertRow(update, run, error, QStringLiteral("Error reading item: ") + key))
                return false;
        }
        run.rowDone();
    }
    return run.finish(error);
}

namespace {
bool readAlterKeys(const ErpReadContext& ctx, const QString& dbPath, bool byDocs, const QString& table,
                   bool suppliers, ReadError* error)
{
    ReaderRun run(ctx, QStringLiteral("קורא מפתחות חליפיים"), QStringLiteral("Error reading alter key: "), kOtherTimeout);
    if (!run.start(dbPath, alterKeyQuerySql(suppliers, byDocs ? ctx.itemByDocCriteria : QString()), error))
        return false;
    Statement insert = run.prepare(
        QStringLiteral("INSERT INTO \"%1\" (AccountKey, ItemKey, AlterNum) VALUES (?1, ?2, ?3)").arg(table), error);
    if (!insert.isValid())
        return false;
    ErpRecordset& rs = run.rs();
    const int cAccount = rs.columnIndex(suppliers ? QStringLiteral("SUPNAME") : QStringLiteral("CUSTNAME"));
    const int cItem = rs.columnIndex(QStringLiteral("PARTNAME"));
    const int cAlter = rs.columnIndex(suppliers ? QStringLiteral("SUPPARTNAME") : QStringLiteral("CUSTPARTNAME"));
    while (rs.next()) {
        const QString item = localKey(rs.value(cItem));
        const QString account = NullTrim(rs.value(cAccount));
        if (!item.isEmpty() && !account.isEmpty()) {
            const QString accountKey = ConvertErpText(account, QString());
            const QString alter = NullTrim(rs.value(cAlter));
            insert.bind(1, accountKey);
            insert.bind(2, item);
            insert.bind(3, alter.isEmpty() ? QStringLiteral("?") : alter);
            if (!insertRow(insert, run, error, QStringLiteral("Error reading alter key: ") + item + QLatin1Char(',') + accountKey))
                return false;
        }
        run.rowDone();
    }
    return run.finish(error);
}
} // namespace

bool ReadAlterKeyPRIORITY(const ErpReadContext& ctx, const QString& dbPath, bool byDocs, const QString& table,
                          ReadError* error)
{
    return readAlterKeys(ctx, dbPath, byDocs, table, false, error);
}

bool ReadAlterKeySupPRIORITY(const ErpReadContext& ctx, const QString& dbPath, bool byDocs, const QString& table,
                             ReadError* error)
{
    return readAlterKeys(ctx, dbPath, byDocs, table, true, error);
}

bool ReadAlterPricePRIORITY(const ErpReadContext& ctx, const QString& dbPath, bool byDocs, const QString& table,
                            ReadError* error)
{
    ReaderRun run(ctx, QStringLiteral("קורא מחירים מיוחדים"), QStringLiteral("Error reading alter price: "), kOtherTimeout);
    const ErpQuery sql = alterPriceQuerySql(DateToErp(QVariant(ctx.today)), byDocs ? ctx.itemByDocCriteria : QString());
    if (!run.start(dbPath, sql, error))
        return false;
    Statement insert = run.prepare(
        QStringLiteral("INSERT INTO \"%1\" (AccountKey, ItemKey, Price, Coin) VALUES (?1, ?2, ?3, ?4)").arg(table), error);
    if (!insert.isValid())
        return false;
    ErpRecordset& rs = run.rs();
    const int cAccount = rs.columnIndex(QStringLiteral("AccountKey")), cItem = rs.columnIndex(QStringLiteral("ItemKey"));
    const int cPrice = rs.columnIndex(QStringLiteral("PRICE")), cCode = rs.columnIndex(QStringLiteral("CurrencyCode"));
    while (rs.next()) {
        // Keys as every other table keeps them, so a special price finds its
        // item (double quotes made apostrophes) and account (in logical order).
        const QString item = localKey(rs.value(cItem));
        const QString rawAccount = NullTrim(rs.value(cAccount));
        const QString account = ConvertErpText(rawAccount, QString());
        if (!item.isEmpty() && !rawAccount.isEmpty()) {
            const QVariant price = rs.value(cPrice);
            insert.bind(1, account);
            insert.bind(2, item);
            insert.bind(3, price.isNull() ? QVariant() : QVariant(NullToDouble(price)));
            insert.bind(4, ConvertErpText(rs.value(cCode), QStringLiteral("?")));
            if (!insertRow(insert, run, error, QStringLiteral("Error reading alter price: ") + item + QLatin1Char(',') + account))
                return false;
        }
        run.rowDone();
    }
    return run.finish(error);
}

bool ReadPriceListPriority(const ErpReadContext& ctx, const QString& dbPath, const QString& fromSort,
                           const QString& toSort, bool byDocs, const QString& table, ReadError* error)
{
    ReaderRun run(ctx, QStringLiteral("קורא מחירונים"), QStringLiteral("Error with price list: "), kOtherTimeout);
    if (!run.start(dbPath, priceListQuerySql(fromSort, toSort, byDocs ? ctx.itemByDocCriteria : QString()), error))
        return false;
    Statement insert = run.prepare(
        QStringLiteral("INSERT INTO \"%1\" (ItemKey, PriceList, Price, Currency) VALUES (?1, ?2, ?3, ?4)").arg(table), error);
    if (!insert.isValid())
        return false;
    ErpRecordset& rs = run.rs();
    const int cList = rs.columnIndex(QStringLiteral("PLIST")), cItem = rs.columnIndex(QStringLiteral("PARTNAME"));
    const int cPrice = rs.columnIndex(QStringLiteral("PRICE")), cCode = rs.columnIndex(QStringLiteral("CODE"));
    while (rs.next()) {
        const QString item = localKey(rs.value(cItem));
        const qint32 list = qint32(rs.value(cList).toLongLong());
        if (!item.isEmpty() && list != 0) {
            const QVariant price = rs.value(cPrice);
            const QString code = NullTrim(rs.value(cCode));
            insert.bind(1, item);
            insert.bind(2, list);
            insert.bind(3, price.isNull() ? 0.0 : NullToDouble(price));
            insert.bind(4, code.isEmpty() ? QStringLiteral("?") : ConvertErpText(rs.value(cCode), QStringLiteral("?")));
            if (!insertRow(insert, run, error,
                           QStringLiteral("Error with price list: ") + QString::number(list) + QLatin1Char(',') + item))
                return false;
        }
        run.rowDone();
    }
    return run.finish(error);
}

bool ReadPriceListNamePriority(const ErpReadContext& ctx, const QString& dbPath, ReadError* error)
{
    ReaderRun run(ctx, QString(), QStringLiteral("תקלה"), kOtherTimeout, 1);
    const ErpQuery sql{QStringLiteral("SELECT PLIST, PLNAME, PLDES FROM PRICELIST WHERE PLIST <> 0"), {}};
    if (!run.start(dbPath, sql, error))
        return false;
    Statement insert = run.prepare(QStringLiteral("INSERT INTO tPLName (PLID, PLName) VALUES (?1, ?2)"), error);
    if (!insert.isValid())
        return false;
    ErpRecordset& rs = run.rs();
    while (rs.next()) {
        insert.bind(1, rs.value(QStringLiteral("PLIST")).toLongLong());
        insert.bind(2, ConvertErpText(rs.value(QStringLiteral("PLNAME")), QStringLiteral("?")));
        if (!insertRow(insert, run, error, QStringLiteral("תקלה")))
            return false;
        run.rowDone();
    }
    return run.finish(error);
}

bool UpdateMainItemTables(const QString& tempItemsPath, QString* error, const QStringList& emptyFirst)
{
    Database db;
    DbError e = db.open(tempItemsPath);
    if (!e) {
        Transaction tx(db);
        for (const QString& table : emptyFirst)
            if (!e)
                e = db.exec(QStringLiteral("DELETE FROM \"%1\"").arg(table));
        for (const char* q : {"qAddUpdateAlterKeys", "qAddUpdateAlterPrices", "qAddUpdatePriceList"})
            if (!e)
                e = db.runQuery(QLatin1String(q));
        if (!e)
            e = tx.commit();
    }
    if (e && error)
        *error = e.message;
    return !e;
}

QVector<PriceField> ReadPriceFields(const QString& connString, QString* error)
{
    QVector<PriceField> out;
    ErpConnection erp;
    if (!erp.open(connString, kPriceFieldTimeout, error))
        return out;
    auto rs = erp.query(QStringLiteral("SELECT PL.PLIST, PL.PLNAME, PL.PLDES FROM PRICELIST PL WHERE PL.PLIST <> -50"), error);
    if (!rs)
        return out;
    while (rs->next()) {
        QString text = NullTrim(rs->value(QStringLiteral("PLDES")));
        if (text.isEmpty())
            text = NullTrim(rs->value(QStringLiteral("PLNAME")));
        // Shown as it reads, whatever the connection type.
        text = text.isEmpty() ? QStringLiteral("אין מחירון") : ConvertErpText(text, QString());
        out.push_back({text, int(rs->value(QStringLiteral("PLIST")).toLongLong())});
    }
    if (rs->failed() && error)
        *error = rs->error();
    return out;
}

} // namespace tagora
