// The ERP's own lists of labels to print: its users, its label definitions
// and each user's label lines, read into the temporary documents database.
#include "erp/platelists.h"

#include "erp/textconv.h"
#include "localdb/database.h"
#include "platform/progress.h"

#include <QFileInfo>

#include <cmath>

namespace tagora {

namespace {
constexpr int kUsersTimeout = 30;
constexpr int kListTimeout = 60;
// The bar is redrawn this seldom, so a long list costs nothing for it.
constexpr long long kProgressEvery = 20;

const QString kDefTitle = QStringLiteral("שגיאה בקריאת סוגי מדבקות");
const QString kDataTitle = QStringLiteral("שגיאה בקריאת נתונים מהמשטח");

void setProgress(const ErpReadContext& ctx, double fraction)
{
    if (ctx.progress)
        ctx.progress->setProgress(fraction);
}

// One list read: the count for the bar, the rows written as they come, all
// in one transaction of the local file.
class ListReader {
public:
    ListReader(const ErpReadContext& ctx, const QString& title, ReadError* error)
        : m_ctx(ctx)
        , m_title(title)
        , m_error(error)
    {
    }
    ~ListReader() { setProgress(m_ctx, 0); }

    bool fail(const QString& message)
    {
        if (m_error)
            *m_error = {m_title, message};
        return false;
    }

    bool open(const QString& dbPath, const QString& insertSql)
    {
        setProgress(m_ctx, 0);
        if (const DbError e = m_db.open(dbPath))
            return fail(e.message);
        QString error;
        if (!m_erp.open(m_ctx.connString, m_ctx.timeout > 0 ? m_ctx.timeout : kListTimeout, &error))
            return fail(error);
        DbError e;
        m_insert = m_db.prepare(insertSql, &e);
        if (e)
            return fail(e.message);
        return true;
    }

    // The number of rows the count query gives, or -1 after a failure.
    long long count(const ErpQuery& q)
    {
        QString error;
        auto rs = m_erp.query(q, &error);
        if (!rs)
            return fail(error), -1;
        if (!rs->next())
            return fail(rs->failed() ? rs->error() : QStringLiteral("לא התקבלה ספירה")), -1;
        return rs->value(QStringLiteral("ItemCount")).toLongLong();
    }

    // Walks the query, handing each row to bind and storing it; a row whose
    // key is stored already is left out.
    bool read(const ErpQuery& q, long long total,
              const std::function<void(const ErpRecordset&, Statement&)>& bind)
    {
        Transaction tx(m_db);
        if (tx.error())
            return fail(tx.error().message);
        QString error;
        auto rs = m_erp.query(q, &error);
        if (!rs)
            return fail(error);
        long long done = 0;
        while (rs->next()) {
            m_insert.clearBindings();
            bind(*rs, m_insert);
            const DbError e = m_insert.run();
            m_insert.reset();
            if (e && !e.isDuplicateKey())
                return fail(e.message);
            ++done;
            if (done % kProgressEvery == 0 && done <= total)
                setProgress(m_ctx, std::round(double(done) / double(total) * 1000.0) / 1000.0);
        }
        if (rs->failed())
            return fail(rs->error());
        if (const DbError e = tx.commit())
            return fail(e.message);
        return true;
    }

private:
    const ErpReadContext& m_ctx;
    QString m_title;
    ReadError* m_error;
    Database m_db;
    ErpConnection m_erp;
    Statement m_insert;
};

bool hasLength(const QVariant& v)
{
    return v.isValid() && !v.isNull() && !v.toString().isEmpty();
}
} // namespace

QVector<ErpUser> ReadErpUsers(const QString& connString, QString* error)
{
    QVector<ErpUser> users;
    ErpConnection erp;
    if (!erp.open(connString, kUsersTimeout, error))
        return users;
    auto rs = erp.query(QStringLiteral("SELECT USERLOGIN, USER FROM USERS WHERE USER > 0"), error);
    if (!rs)
        return users;
    while (rs->next()) {
        const QString name = NullTrim(rs->value(QStringLiteral("USERLOGIN")));
        if (!name.isEmpty())
            users.push_back({VisualToLogical(name), int(rs->value(QStringLiteral("USER")).toLongLong())});
    }
    if (rs->failed() && error)
        *error = rs->error();
    return users;
}

bool ReadLabelDefPriority(const ErpReadContext& ctx, const QString& dbPath, const QString& defaultLabel,
                          ReadError* error)
{
    ListReader reader(ctx, kDefTitle, error);
    if (!reader.open(dbPath, QStringLiteral("INSERT INTO tPLabDef (LabelID, LabelName, LabelPath) VALUES (?1, ?2, ?3)")))
        return false;
    const long long total = reader.count({QStringLiteral("SELECT Count(LABELDEF) As ItemCount FROM LABELSDEF"), {}});
    if (total <= 0)
        return total == 0;
    const ErpQuery q{QStringLiteral("SELECT LABELDEF, LABELNAME, LABELPATH FROM LABELSDEF"), {}};
    return reader.read(q, total, [&defaultLabel](const ErpRecordset& rs, Statement& insert) {
        insert.bind(1, rs.value(QStringLiteral("LABELDEF")));
        insert.bind(2, ConvertErpText(rs.value(QStringLiteral("LABELNAME")), QStringLiteral("?")));
        // Looked for on this computer, now: the file a definition names may
        // be on a drive only the ERP's own machines have.
        QString path = ConvertErpText(rs.value(QStringLiteral("LABELPATH")), QString());
        if (path.isEmpty() || !QFileInfo(path).isFile())
            path = defaultLabel;
        insert.bind(3, path);
    });
}

ErpQuery labelDataCountSql(int user)
{
    return {QStringLiteral("SELECT Count(KLine) As ItemCount FROM LABELS WHERE USER = ?"), {user}};
}

ErpQuery labelDataSql(int user)
{
    return {QStringLiteral("SELECT * FROM LABELS WHERE USER = ? ORDER BY KLINE"), {user}};
}

bool ReadLabelDataPriority(const ErpReadContext& ctx, const QString& dbPath, int user, ReadError* error)
{
    QString sql = QStringLiteral("INSERT INTO tPLabData (KLine, Copies, LabelID, LineSort");
    QString values = QStringLiteral(") VALUES (?1, ?2, ?3, ?4");
    for (int n = 1; n <= 20; ++n) {
        sql += QStringLiteral(", Par%1").arg(n);
        values += QStringLiteral(", ?%1").arg(n + 4);
    }
    ListReader reader(ctx, kDataTitle, error);
    if (!reader.open(dbPath, sql + values + QLatin1Char(')')))
        return false;
    const long long total = reader.count(labelDataCountSql(user));
    if (total <= 0)
        return total == 0;
    return reader.read(labelDataSql(user), total, [](const ErpRecordset& rs, Statement& insert) {
        insert.bind(1, rs.value(QStringLiteral("KLINE")));
        insert.bind(2, rs.value(QStringLiteral("LABELQUANT")));
        insert.bind(3, rs.value(QStringLiteral("LABELDEF")));
        insert.bind(4, rs.value(QStringLiteral("Sort")));
        for (int n = 1; n <= 20; ++n) {
            const QVariant par = rs.value(QStringLiteral("PAR%1").arg(n));
            insert.bind(n + 4, hasLength(par) ? QVariant(ConvertErpLabelText(par, QStringLiteral("?"))) : QVariant());
        }
    });
}

int PlateVarNumber(const QString& caption)
{
    bool ok = false;
    const int n = caption.trimmed().toInt(&ok);
    return ok && n >= 1 && n <= 20 ? n : 0;
}

QString PlateItemQuery(const QString& accountKey, const std::vector<PlateFieldRow>& rows, uchar orderBy)
{
    QString key = accountKey;
    key.replace(QLatin1Char('\''), QLatin1String("''"));
    QString sql = QStringLiteral("SELECT tPLabData.Copies, tPLabDef.LabelPath, '") + key + QStringLiteral("' As AccountKey");
    for (const PlateFieldRow& row : rows) {
        const int n = PlateVarNumber(row.varCaption);
        if (row.sent && n > 0)
            sql += QStringLiteral(", tPLabData.PAR%1 As %2").arg(n).arg(row.column);
    }
    sql += QStringLiteral(" FROM (tPLabData INNER JOIN tPLabDef ON tPLabDef.LabelID = tPLabData.LabelID) WHERE (1 > 0)");
    const QString direction = orderBy == 1 ? QStringLiteral("ASC") : orderBy == 2 ? QStringLiteral("DESC") : QString();
    sql += QStringLiteral(" ORDER BY tPLabData.LineSort ") + direction + QStringLiteral(", tPLabData.KLine ") + direction;
    return sql;
}

} // namespace tagora
