#include "erp/itemimport.h"

#include "erp/odbc.h"
#include "erp/textconv.h"
#include "localdb/database.h"
#include "platform/progress.h"

#include <array>
#include <condition_variable>
#include <deque>
#include <functional>
#include <mutex>
#include <thread>
#ifdef __linux__
#include <pthread.h>
#endif
#include <vector>

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

// One ERP row as the reading thread hands it over: the reader's columns'
// values as the driver gave them, in the reader's order.
struct WriteRow {
    std::array<QVariant, 10> raw;
};

// The statement's values for one row, from ?1 on.
struct BindRow {
    std::array<BindValue, 10> values;
    int count = 0;
};

// Turns a row's ERP values into the statement's values, on the writing
// thread, so the reading thread does nothing but fetch. False skips the row.
using RowConverter = std::function<bool(const QVariant* raw, BindRow& out)>;

// Rows travel in batches, so the threads meet once per batch, not per row.
constexpr int kBatchRows = 256;
// Batches in flight: the reader runs this far ahead of the writer and no
// further, so memory stays flat however many rows the ERP sends.
constexpr int kBatchesInFlight = 8;

// The local side of a reader: a thread that converts, binds and runs one
// prepared statement for every row the reading thread hands it, inside the
// reader's transaction. Converting here rather than while reading splits the
// work about evenly between the two threads: the driver's fetching is most
// of the reading side. A duplicate key skips the row; any other error stops
// the writer and is kept with the row it failed on.
class RowWriter {
public:
    RowWriter(Statement& statement, const RowConverter& convert)
        : m_statement(statement)
        , m_convert(convert)
    {
        for (int i = 0; i < kBatchesInFlight; ++i)
            m_spare.push_back({std::vector<WriteRow>(size_t(kBatchRows)), 0});
        m_thread = std::thread([this] {
#ifdef __linux__
            // Named, so a profile or a debugger tells the two sides apart.
            pthread_setname_np(pthread_self(), "tagora-writer");
#endif
            run();
        });
    }

    ~RowWriter() { finish(); }

    // A row to fill; it is sent with its batch. Waits while the writer is
    // a full queue behind.
    WriteRow& nextRow()
    {
        if (m_filling.used == kBatchRows)
            flush();
        if (m_filling.rows.empty())
            m_filling = takeSpare();
        return m_filling.rows[size_t(m_filling.used++)];
    }

    // Sends what is filled and waits for the writer to write it all.
    void finish()
    {
        if (!m_thread.joinable())
            return;
        flush();
        {
            std::lock_guard<std::mutex> lock(m_mutex);
            m_closed = true;
        }
        m_wake.notify_all();
        m_thread.join();
    }

    // Stops the writer without writing what is still queued.
    void abandon()
    {
        {
            std::lock_guard<std::mutex> lock(m_mutex);
            m_stop = true;
            m_queue.clear();
        }
        m_filling.used = 0;
        finish();
    }

    bool failed() const
    {
        std::lock_guard<std::mutex> lock(m_mutex);
        return m_failed;
    }
    // The failed row's values and the engine's message; read after finish().
    const BindRow& failedRow() const { return m_bound; }
    const QString& failure() const { return m_failure; }

private:
    // A batch's rows live as long as the run, so their text buffers are
    // filled again rather than allocated for every row.
    struct Batch {
        std::vector<WriteRow> rows;
        int used = 0;
    };

    Batch takeSpare()
    {
        std::unique_lock<std::mutex> lock(m_mutex);
        m_room.wait(lock, [this] { return !m_spare.empty() || m_stop; });
        if (m_spare.empty())
            return {std::vector<WriteRow>(size_t(kBatchRows)), 0};
        Batch b = std::move(m_spare.back());
        m_spare.pop_back();
        return b;
    }

    void flush()
    {
        if (m_filling.used == 0)
            return;
        {
            std::lock_guard<std::mutex> lock(m_mutex);
            if (!m_stop)
                m_queue.push_back(std::move(m_filling));
        }
        m_filling = Batch();
        m_wake.notify_one();
    }

    void run()
    {
        for (;;) {
            Batch batch;
            {
                std::unique_lock<std::mutex> lock(m_mutex);
                m_wake.wait(lock, [this] { return !m_queue.empty() || m_closed || m_stop; });
                if (m_stop || m_queue.empty())
                    return;
                batch = std::move(m_queue.front());
                m_queue.pop_front();
            }
            for (int i = 0; i < batch.used; ++i)
                if (!write(batch.rows[size_t(i)]))
                    return;
            batch.used = 0;
            {
                std::lock_guard<std::mutex> lock(m_mutex);
                m_spare.push_back(std::move(batch));
            }
            m_room.notify_one();
        }
    }

    bool write(const WriteRow& row)
    {
        if (!m_convert(row.raw.data(), m_bound))
            return true;
        for (int i = 0; i < m_bound.count; ++i)
            m_statement.bind(i + 1, m_bound.values[size_t(i)]);
        const DbError e = m_statement.run();
        if (!e || e.isDuplicateKey())
            return true;
        m_failure = e.message;
        {
            std::lock_guard<std::mutex> lock(m_mutex);
            m_failed = m_stop = true;
            m_queue.clear();
        }
        m_room.notify_all();
        return false;
    }

    Statement& m_statement;
    const RowConverter& m_convert;
    BindRow m_bound; // filled again for every row, its buffers kept
    std::thread m_thread;
    mutable std::mutex m_mutex;
    std::condition_variable m_wake; // the writer waits for a batch
    std::condition_variable m_room; // the reader waits for a spare batch
    std::deque<Batch> m_queue;
    std::vector<Batch> m_spare;
    Batch m_filling;
    bool m_closed = false;
    bool m_stop = false;
    bool m_failed = false;
    QString m_failure;
};

// What progress counts against when the reader runs over a whole table:
// the table's own row count, which the server gives at once, instead of a
// second run of the whole query only to count it.
struct ProgressBasis {
    QString table; // empty: count the query itself (a restricted, small run)
};

// The frame every reader shares: connection, query, local database, one
// transaction, progress, and the writing thread. The reading thread (the
// caller's, so the screen's progress bar keeps moving) fetches each row;
// the writer converts it, binds and runs the statement. Either side failing,
// or the user cancelling, rolls the transaction back: the local database is
// left as it was before the reader started.
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

    ~ReaderRun()
    {
        if (m_writer)
            m_writer->abandon();
        if (m_db.inTransaction())
            m_db.rollback();
        report(0);
    }

    // Opens the local database and the ERP query; false with the error set.
    // With a basis table, progress counts against that table's rows.
    bool start(const QString& dbPath, const ErpQuery& q, ReadError* error, const ProgressBasis& basis = {})
    {
        DbError e = m_db.open(dbPath);
        if (!e)
            e = m_db.begin();
        if (e)
            return fail(error, QString(), e.message);
        QString message;
        if (!m_erp.open(m_ctx.connString, m_timeout, &message))
            return fail(error, QString(), message);
        if (m_ctx.progress) {
            if (basis.table.isEmpty())
                m_count = m_erp.countRows(q.sql, q.params);
            else
                m_count = m_erp.countRows(QStringLiteral("SELECT 1 FROM ") + basis.table);
        }
        m_rs = m_erp.query(q, &message);
        if (!m_rs)
            return fail(error, QString(), message);
        return true;
    }

    // Prepares the statement the writer runs for every row, with the
    // conversion that makes its values; titleParts are the positions of the
    // values that name a failed row in the failure's title, in order.
    bool prepare(const QString& sql, ReadError* error, std::initializer_list<int> titleParts,
                 RowConverter convert)
    {
        DbError e;
        m_statement = m_db.prepare(sql, &e);
        if (e)
            return fail(error, QString(), e.message);
        m_titleParts.assign(titleParts.begin(), titleParts.end());
        m_convert = std::move(convert);
        return true;
    }

    Database& db() { return m_db; }

    // Reads every row, handing the named columns' values (absent ones as
    // null) to the writer in this order, then ends the run as finish() does.
    bool readAll(const QStringList& columns, ReadError* error)
    {
        std::vector<int> at;
        for (const QString& c : columns)
            at.push_back(m_rs->columnIndex(c));
        m_writer = std::make_unique<RowWriter>(m_statement, m_convert);
        ErpRecordset& rs = *m_rs;
        while (rs.next()) {
            WriteRow& row = m_writer->nextRow();
            for (size_t i = 0; i < at.size(); ++i)
                row.raw[i] = at[i] >= 0 ? rs.value(at[i]) : QVariant();
            if (!rowDone())
                break;
        }
        return finish(error);
    }

    bool fail(ReadError* error, const QString& title, const QString& message)
    {
        if (m_writer)
            m_writer->abandon();
        if (m_db.inTransaction())
            m_db.rollback();
        if (error)
            *error = {title.isEmpty() ? m_title : title, message};
        return false;
    }

private:
    // After each ERP row: progress every few rows. False when the run must
    // end early: the writer failed or the user cancelled.
    bool rowDone()
    {
        ++m_row;
        if (m_row % m_every != 0)
            return true;
        if (m_count > 0)
            report(double(m_row) / double(m_count));
        if (m_ctx.progress && m_ctx.progress->cancelRequested()) {
            m_cancelled = true;
            return false;
        }
        return !(m_writer && m_writer->failed());
    }

    // Ends the run: the writer's rows committed if all went well, else
    // nothing kept and the error set.
    bool finish(ReadError* error)
    {
        if (m_writer && !m_cancelled && !(m_rs && m_rs->failed()))
            m_writer->finish();
        if (m_writer && m_writer->failed())
            return fail(error, failedTitle(), m_writer->failure());
        if (m_cancelled)
            return fail(error, QString(), QStringLiteral("הקליטה בוטלה"));
        if (m_rs && m_rs->failed())
            return fail(error, QString(), m_rs->error());
        if (m_db.inTransaction())
            if (DbError e = m_db.commit())
                return fail(error, QString(), e.message);
        return true;
    }

    void report(double fraction)
    {
        if (!m_ctx.progress)
            return;
        // The bar moves by a thousandth at most between reports, and a basis
        // table may hold rows the query leaves out.
        const int permille = int(std::min(fraction, 1.0) * 1000);
        if (permille == m_reported && fraction != 0)
            return;
        m_reported = permille;
        m_ctx.progress->setProgress(std::min(fraction, 1.0));
    }

    QString failedTitle() const
    {
        const BindRow& row = m_writer->failedRow();
        QStringList parts;
        for (const int i : m_titleParts)
            parts << row.values[size_t(i)].toVariant().toString();
        return parts.isEmpty() ? m_title : m_title + parts.join(QLatin1Char(','));
    }

    const ErpReadContext& m_ctx;
    QString m_title;
    int m_timeout;
    int m_every;
    Database m_db;
    ErpConnection m_erp;
    std::unique_ptr<ErpRecordset> m_rs;
    Statement m_statement;
    RowConverter m_convert;
    std::vector<int> m_titleParts;
    // Declared after the statement and the database it writes through, so
    // it stops before either goes.
    std::unique_ptr<RowWriter> m_writer;
    long long m_count = -1;
    long long m_row = 0;
    int m_reported = -1;
    bool m_cancelled = false;
};
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
                   const QString& orderBy, const ErpParams& docParams)
{
    const ErpQuery range = familyRangeSql(fromSort, toSort);
    q.sql += range.sql + docCriteria + orderBy;
    q.params += range.params;
    q.params += docParams;
    return q;
}
} // namespace

ErpQuery itemQuerySql(const QString& fromSort, const QString& toSort, bool foreignNames, int priceList,
                      bool withWarehouse, const QString& docCriteria, const ErpParams& docParams)
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
    return withRange(q, fromSort, toSort, docCriteria, QStringLiteral(" Order By PART.PARTNAME"), docParams);
}

ErpQuery foreignNameQuerySql(const QString& fromSort, const QString& toSort, const QString& docCriteria,
                             const ErpParams& docParams)
{
    return withRange({QStringLiteral("SELECT PART.PARTNAME, PARTDES.EPARTDES FROM PART, FAMILY, PARTDES"
                                     " WHERE (PART.TYPE = 'R' OR PART.TYPE = 'P') AND FAMILY.FAMILY = PART.FAMILY"
                                     " AND PARTDES.PART = PART.PART"),
                      {}},
                     fromSort, toSort, docCriteria, QStringLiteral(" Order By PART.PARTNAME"), docParams);
}

ErpQuery alterKeyQuerySql(bool suppliers, const QString& docCriteria, const ErpParams& docParams)
{
    if (suppliers)
        return {QStringLiteral("SELECT SUPPLIERS.SUPNAME, PART.PARTNAME, SUPPART.SUPPARTNAME"
                               " FROM SUPPLIERS, SUPPART, PART WHERE SUPPLIERS.SUP = SUPPART.SUP"
                               " AND PART.PART = SUPPART.PART")
                    + docCriteria,
                docParams};
    return {QStringLiteral("SELECT CUSTOMERS.CUSTNAME, PART.PARTNAME, CUSTPART.CUSTPARTNAME"
                           " FROM CUSTOMERS, CUSTPART, PART WHERE CUSTOMERS.CUST = CUSTPART.CUST"
                           " AND PART.PART = CUSTPART.PART")
                + docCriteria,
            docParams};
}

ErpQuery alterPriceQuerySql(const QVariant& today, const QString& docCriteria, const ErpParams& docParams)
{
    return {QStringLiteral("SELECT CUSTOMERS.CUSTNAME As AccountKey, PART.PARTNAME As ItemKey"
                           ", CUSTPARTPRICE.PRICE, CURRENCIES.CODE As CurrencyCode"
                           " FROM CUSTOMERS, CUSTPARTPRICE, PART, CURRENCIES"
                           " WHERE CUSTOMERS.CUST = CUSTPARTPRICE.CUST AND PART.PART = CUSTPARTPRICE.PART"
                           " AND CURRENCIES.CURRENCY = CUSTPARTPRICE.CURRENCY"
                           " AND CUSTPARTPRICE.EXPIRYDATE >= ? AND CUSTPARTPRICE.FROMDATE <= ?")
                + docCriteria,
            ErpParams{today, today} + docParams};
}

ErpQuery priceListQuerySql(const QString& fromSort, const QString& toSort, const QString& docCriteria,
                           const ErpParams& docParams)
{
    return withRange({QStringLiteral("SELECT PARTPRICE.PLIST, PART.PARTNAME, PARTPRICE.PRICE, CURRENCIES.CODE"
                                     " FROM CURRENCIES, PARTPRICE, PART, FAMILY"
                                     " WHERE (PART.TYPE = 'R' OR PART.TYPE = 'P') AND CURRENCIES.CURRENCY = PARTPRICE.CURRENCY"
                                     " AND PARTPRICE.PART = PART.PART AND FAMILY.FAMILY = PART.FAMILY"),
                      {}},
                     fromSort, toSort, docCriteria, QStringLiteral(" ORDER BY PARTPRICE.PLIST, PART.PARTNAME"),
                     docParams);
}

namespace {
// The values of the documents' criteria, when the reader runs by documents.
ErpParams docParams(const ErpReadContext& ctx, bool byDocs)
{
    return byDocs ? ctx.itemByDocParams : ErpParams();
}

// The whole table as progress's basis when nothing restricts the run.
ProgressBasis basisFor(const QString& table, bool restricted)
{
    return restricted ? ProgressBasis{} : ProgressBasis{table};
}
} // namespace

bool ReadItemPriority(const ErpReadContext& ctx, const QString& dbPath, const QString& fromSort,
                      const QString& toSort, bool foreignNames, short copies, int priceList, bool byDocs,
                      bool withWarehouse, ReadError* error, bool replaceAll)
{
    ReaderRun run(ctx, QStringLiteral("קורא פריטים"), QStringLiteral("Error reading item: "), kItemTimeout);
    const ErpQuery sql = itemQuerySql(fromSort, toSort, foreignNames, priceList, withWarehouse,
                                     byDocs ? ctx.itemByDocCriteria : QString(), docParams(ctx, byDocs));
    if (!run.start(dbPath, sql, error, basisFor(QStringLiteral("PART"), byDocs || !fromSort.isEmpty() || !toSort.isEmpty())))
        return false;
    // Found by key and updated, or added; a field the ERP leaves empty keeps
    // what an existing row had (NULL here means "not written").
    const QString upsert = QStringLiteral(
        "INSERT INTO tItems (ItemKey, VNItemName, ItemName, ItemSort, Unit, BarCode, Price, Coin, Copies, PurPackUN, Local)"
        " VALUES (?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9, 1, ?10)"
        " ON CONFLICT (ItemKey) DO UPDATE SET VNItemName = coalesce(excluded.VNItemName, VNItemName),"
        " ItemName = coalesce(excluded.ItemName, ItemName), ItemSort = excluded.ItemSort,"
        " Unit = coalesce(excluded.Unit, Unit), BarCode = coalesce(excluded.BarCode, BarCode),"
        " Price = excluded.Price, Coin = excluded.Coin, Copies = excluded.Copies, PurPackUN = 1,"
        " Local = coalesce(excluded.Local, Local)");
    const bool ok = run.prepare(upsert, error, {0}, [=](const QVariant* raw, BindRow& row) {
        // raw: PARTNAME, PARTDES, FAMILYNAME, UNITNAME, BARCODE, PRICE, CURRCODE, LOCAL, EPARTDES
        const QString key = localKey(raw[0]);
        if (key.isEmpty())
            return false;
        auto& v = row.values;
        row.count = 10;
        const QString des = NullTrim(raw[1]);
        v[0].setText(key);
        if (des.isEmpty())
            v[1].setNull();
        else
            v[1].setText(ReverseForCells(des));
        if (foreignNames)
            v[2].setTextOrNull(NullTrim(raw[8]));
        else if (des.isEmpty())
            v[2].setNull();
        else
            v[2].setText(ConvertErpText(des, QString()));
        if (raw[2].isNull())
            v[3].setNull();
        else
            v[3].setText(raw[2].toString());
        v[4].setTextOrNull(ConvertErpText(NullTrim(raw[3]), QString()));
        v[5].setTextOrNull(ConvertErpText(NullTrim(raw[4]), QString()));
        const bool priced = priceList != 0 && !raw[5].isNull();
        v[6].setReal(priced ? NullToDouble(raw[5]) : 0.0);
        const QString code = priced ? ConvertErpText(NullTrim(raw[6]), QString()) : QString();
        if (code.isEmpty())
            v[7].setText(u"$");
        else
            v[7].setText(code);
        v[8].setInteger(copies);
        v[9].setTextOrNull(NullTrim(raw[7]));
        return true;
    });
    if (!ok)
        return false;
    // Emptied in the transaction that refills it, so until the last row is in
    // the old items and their marks are what a crash or an error leaves.
    if (replaceAll)
        if (const DbError e = run.db().exec(QStringLiteral("DELETE FROM tItems")))
            return run.fail(error, QString(), e.message);
    return run.readAll({QStringLiteral("PARTNAME"), QStringLiteral("PARTDES"), QStringLiteral("FAMILYNAME"),
                        QStringLiteral("UNITNAME"), QStringLiteral("BARCODE"), QStringLiteral("PRICE"),
                        QStringLiteral("CURRCODE"), QStringLiteral("LOCAL"), QStringLiteral("EPARTDES")},
                       error);
}

bool ReadItemFName(const ErpReadContext& ctx, const QString& dbPath, const QString& fromSort, const QString& toSort,
                   bool byDocs, ReadError* error)
{
    ReaderRun run(ctx, QStringLiteral("קורא תאורים לועזיים"), QStringLiteral("Error reading item: "), kItemTimeout);
    if (!run.start(dbPath, foreignNameQuerySql(fromSort, toSort, byDocs ? ctx.itemByDocCriteria : QString(), docParams(ctx, byDocs)), error,
                   basisFor(QStringLiteral("PARTDES"), byDocs || !fromSort.isEmpty() || !toSort.isEmpty())))
        return false;
    const bool ok = run.prepare(QStringLiteral("UPDATE tItems SET Fname = ?2 WHERE ItemKey = ?1"), error, {0},
                                [](const QVariant* raw, BindRow& row) {
                                    const QString key = localKey(raw[0]);
                                    const QString foreign = NullTrim(raw[1]);
                                    if (key.isEmpty() || foreign.isEmpty())
                                        return false;
                                    row.count = 2;
                                    row.values[0].setText(key);
                                    row.values[1].setText(foreign);
                                    return true;
                                });
    return ok && run.readAll({QStringLiteral("PARTNAME"), QStringLiteral("EPARTDES")}, error);
}

namespace {
bool readAlterKeys(const ErpReadContext& ctx, const QString& dbPath, bool byDocs, const QString& table,
                   bool suppliers, ReadError* error)
{
    ReaderRun run(ctx, QStringLiteral("קורא מפתחות חליפיים"), QStringLiteral("Error reading alter key: "), kOtherTimeout);
    if (!run.start(dbPath, alterKeyQuerySql(suppliers, byDocs ? ctx.itemByDocCriteria : QString(), docParams(ctx, byDocs)), error,
                   basisFor(suppliers ? QStringLiteral("SUPPART") : QStringLiteral("CUSTPART"), byDocs)))
        return false;
    const bool ok = run.prepare(
        QStringLiteral("INSERT INTO \"%1\" (AccountKey, ItemKey, AlterNum) VALUES (?1, ?2, ?3)").arg(table), error,
        {1, 0}, [](const QVariant* raw, BindRow& row) {
            // raw: account, PARTNAME, alternate number
            const QString item = localKey(raw[1]);
            const QString account = NullTrim(raw[0]);
            if (item.isEmpty() || account.isEmpty())
                return false;
            const QString alter = NullTrim(raw[2]);
            row.count = 3;
            row.values[0].setText(ConvertErpText(account, QString()));
            row.values[1].setText(item);
            if (alter.isEmpty())
                row.values[2].setText(u"?");
            else
                row.values[2].setText(alter);
            return true;
        });
    return ok
        && run.readAll({suppliers ? QStringLiteral("SUPNAME") : QStringLiteral("CUSTNAME"), QStringLiteral("PARTNAME"),
                        suppliers ? QStringLiteral("SUPPARTNAME") : QStringLiteral("CUSTPARTNAME")},
                       error);
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
    const ErpQuery sql = alterPriceQuerySql(DateToErp(QVariant(ctx.today)), byDocs ? ctx.itemByDocCriteria : QString(), docParams(ctx, byDocs));
    // Counted exactly: the day's window may leave out most of the table.
    if (!run.start(dbPath, sql, error))
        return false;
    const bool ok = run.prepare(
        QStringLiteral("INSERT INTO \"%1\" (AccountKey, ItemKey, Price, Coin) VALUES (?1, ?2, ?3, ?4)").arg(table), error,
        {1, 0}, [](const QVariant* raw, BindRow& row) {
            // raw: AccountKey, ItemKey, PRICE, CurrencyCode. Keys as every
            // other table keeps them, so a special price finds its item
            // (double quotes made apostrophes) and account (in logical order).
            const QString item = localKey(raw[1]);
            const QString rawAccount = NullTrim(raw[0]);
            if (item.isEmpty() || rawAccount.isEmpty())
                return false;
            auto& v = row.values;
            row.count = 4;
            v[0].setText(ConvertErpText(rawAccount, QString()));
            v[1].setText(item);
            if (raw[2].isNull())
                v[2].setNull();
            else
                v[2].setReal(NullToDouble(raw[2]));
            v[3].setText(ConvertErpText(raw[3], QStringLiteral("?")));
            return true;
        });
    return ok
        && run.readAll({QStringLiteral("AccountKey"), QStringLiteral("ItemKey"), QStringLiteral("PRICE"),
                        QStringLiteral("CurrencyCode")},
                       error);
}

bool ReadPriceListPriority(const ErpReadContext& ctx, const QString& dbPath, const QString& fromSort,
                           const QString& toSort, bool byDocs, const QString& table, ReadError* error)
{
    ReaderRun run(ctx, QStringLiteral("קורא מחירונים"), QStringLiteral("Error with price list: "), kOtherTimeout);
    if (!run.start(dbPath, priceListQuerySql(fromSort, toSort, byDocs ? ctx.itemByDocCriteria : QString(), docParams(ctx, byDocs)), error,
                   basisFor(QStringLiteral("PARTPRICE"), byDocs || !fromSort.isEmpty() || !toSort.isEmpty())))
        return false;
    const bool ok = run.prepare(
        QStringLiteral("INSERT INTO \"%1\" (ItemKey, PriceList, Price, Currency) VALUES (?1, ?2, ?3, ?4)").arg(table),
        error, {1, 0}, [](const QVariant* raw, BindRow& row) {
            // raw: PLIST, PARTNAME, PRICE, CODE
            const QString item = localKey(raw[1]);
            const qint32 list = qint32(raw[0].toLongLong());
            if (item.isEmpty() || list == 0)
                return false;
            auto& v = row.values;
            row.count = 4;
            v[0].setText(item);
            v[1].setInteger(list);
            v[2].setReal(raw[2].isNull() ? 0.0 : NullToDouble(raw[2]));
            if (NullTrim(raw[3]).isEmpty())
                v[3].setText(u"?");
            else
                v[3].setText(ConvertErpText(raw[3], QStringLiteral("?")));
            return true;
        });
    return ok
        && run.readAll({QStringLiteral("PLIST"), QStringLiteral("PARTNAME"), QStringLiteral("PRICE"), QStringLiteral("CODE")},
                       error);
}

bool ReadPriceListNamePriority(const ErpReadContext& ctx, const QString& dbPath, ReadError* error)
{
    ReaderRun run(ctx, QString(), QStringLiteral("תקלה"), kOtherTimeout, 1);
    const ErpQuery sql{QStringLiteral("SELECT PLIST, PLNAME, PLDES FROM PRICELIST WHERE PLIST <> 0"), {}};
    if (!run.start(dbPath, sql, error))
        return false;
    const bool ok = run.prepare(QStringLiteral("INSERT INTO tPLName (PLID, PLName) VALUES (?1, ?2)"), error, {},
                                [](const QVariant* raw, BindRow& row) {
                                    row.count = 2;
                                    row.values[0].setInteger(raw[0].toLongLong());
                                    row.values[1].setText(ConvertErpText(raw[1], QStringLiteral("?")));
                                    return true;
                                });
    return ok && run.readAll({QStringLiteral("PLIST"), QStringLiteral("PLNAME")}, error);
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
