#include "erp/odbc.h"

#include <QDate>
#include <QDateTime>
#include <QRegularExpression>

#include <algorithm>

#include <sql.h>
#include <sqlext.h>
#include <sqlucode.h>

namespace tagora {

namespace {
static_assert(sizeof(SQLWCHAR) == sizeof(char16_t), "the ODBC wide type must be UTF-16");

std::u16string wide(const QString& s)
{
    return std::u16string(reinterpret_cast<const char16_t*>(s.utf16()), size_t(s.size()));
}

SQLWCHAR* wptr(std::u16string& s)
{
    return reinterpret_cast<SQLWCHAR*>(s.data());
}

// Code units as they are: a long value comes in pieces, and a piece may start
// with U+FEFF, which QString::fromUtf16 would take for a byte order mark and drop.
QString fromWide(const SQLWCHAR* s, qsizetype chars)
{
    return QString(reinterpret_cast<const QChar*>(s), chars);
}

QString diagnostics(SQLSMALLINT type, SQLHANDLE handle)
{
    QStringList parts;
    for (SQLSMALLINT i = 1; i < 10; ++i) {
        SQLWCHAR state[6] = {};
        SQLINTEGER native = 0;
        SQLWCHAR text[1024] = {};
        SQLSMALLINT len = 0;
        const SQLRETURN rc = SQLGetDiagRecW(type, handle, i, state, &native, text, 1023, &len);
        if (!SQL_SUCCEEDED(rc))
            break;
        parts << fromWide(text, std::min<qsizetype>(len, 1023)).trimmed();
    }
    if (parts.isEmpty())
        return QStringLiteral("ODBC error");
    return parts.join(QLatin1Char('\n'));
}

// The top-level ORDER BY of a query: a count over the query does not need it,
// and some servers refuse it in a derived table.
QString withoutOrderBy(const QString& sql)
{
    int depth = 0;
    bool quoted = false;
    int last = -1;
    for (int i = 0; i < sql.size(); ++i) {
        const QChar c = sql[i];
        if (c == QLatin1Char('\'')) {
            quoted = !quoted;
            continue;
        }
        if (quoted)
            continue;
        if (c == QLatin1Char('('))
            ++depth;
        else if (c == QLatin1Char(')'))
            --depth;
        else if (depth == 0 && (c == QLatin1Char('O') || c == QLatin1Char('o'))
                 && sql.mid(i, 8).compare(QLatin1String("ORDER BY"), Qt::CaseInsensitive) == 0
                 && (i == 0 || sql[i - 1].isSpace()))
            last = i;
    }
    return last >= 0 ? sql.left(last) : sql;
}
} // namespace

QString odbcConnValue(const QString& value)
{
    const bool needs = value.contains(QLatin1Char(';')) || value.contains(QLatin1Char('{'))
        || value.contains(QLatin1Char('}')) || (!value.isEmpty() && (value.front().isSpace() || value.back().isSpace()));
    if (!needs)
        return value;
    QString v = value;
    v.replace(QLatin1Char('}'), QLatin1String("}}"));
    return QLatin1Char('{') + v + QLatin1Char('}');
}

struct ErpConnection::Handles {
    SQLHENV env = SQL_NULL_HENV;
    SQLHDBC dbc = SQL_NULL_HDBC;
    bool connected = false;
};

ErpConnection::ErpConnection()
    : m_h(std::make_unique<Handles>())
{
}

ErpConnection::~ErpConnection()
{
    close();
}

bool ErpConnection::open(const QString& connectionText, int timeoutSeconds, QString* error)
{
    close();
    m_timeout = timeoutSeconds;
    auto fail = [&](SQLSMALLINT type, SQLHANDLE handle) {
        if (error)
            *error = diagnostics(type, handle);
        close();
        return false;
    };
    if (!SQL_SUCCEEDED(SQLAllocHandle(SQL_HANDLE_ENV, SQL_NULL_HANDLE, &m_h->env)))
        return fail(SQL_HANDLE_ENV, m_h->env);
    SQLSetEnvAttr(m_h->env, SQL_ATTR_ODBC_VERSION, reinterpret_cast<SQLPOINTER>(SQL_OV_ODBC3), 0);
    if (!SQL_SUCCEEDED(SQLAllocHandle(SQL_HANDLE_DBC, m_h->env, &m_h->dbc)))
        return fail(SQL_HANDLE_ENV, m_h->env);
    const auto seconds = reinterpret_cast<SQLPOINTER>(static_cast<SQLULEN>(timeoutSeconds));
    SQLSetConnectAttr(m_h->dbc, SQL_ATTR_LOGIN_TIMEOUT, seconds, 0);
    SQLSetConnectAttr(m_h->dbc, SQL_ATTR_CONNECTION_TIMEOUT, seconds, 0);
    SQLSetConnectAttr(m_h->dbc, SQL_ATTR_ACCESS_MODE, reinterpret_cast<SQLPOINTER>(SQL_MODE_READ_ONLY), 0);

    std::u16string text = wide(connectionText);
    SQLWCHAR out[1024];
    SQLSMALLINT outLen = 0;
    const SQLRETURN rc = SQLDriverConnectW(m_h->dbc, nullptr, wptr(text), SQLSMALLINT(text.size()), out, 1023, &outLen,
                                           SQL_DRIVER_NOPROMPT);
    if (!SQL_SUCCEEDED(rc))
        return fail(SQL_HANDLE_DBC, m_h->dbc);
    m_h->connected = true;
    // Some drivers take the read-only mode only once connected.
    SQLSetConnectAttr(m_h->dbc, SQL_ATTR_ACCESS_MODE, reinterpret_cast<SQLPOINTER>(SQL_MODE_READ_ONLY), 0);

    SQLWCHAR name[256] = {};
    SQLSMALLINT nameLen = 0;
    if (SQL_SUCCEEDED(SQLGetInfoW(m_h->dbc, SQL_DBMS_NAME, name, sizeof(name) - sizeof(SQLWCHAR), &nameLen)))
        m_dbms = fromWide(name, nameLen / qsizetype(sizeof(SQLWCHAR)));
    return true;
}

void ErpConnection::close()
{
    if (m_h->dbc != SQL_NULL_HDBC) {
        if (m_h->connected)
            SQLDisconnect(m_h->dbc);
        SQLFreeHandle(SQL_HANDLE_DBC, m_h->dbc);
        m_h->dbc = SQL_NULL_HDBC;
    }
    if (m_h->env != SQL_NULL_HENV) {
        SQLFreeHandle(SQL_HANDLE_ENV, m_h->env);
        m_h->env = SQL_NULL_HENV;
    }
    m_h->connected = false;
    m_dbms.clear();
}

bool ErpConnection::isOpen() const
{
    return m_h->connected;
}

bool ErpConnection::isSqlite() const
{
    return m_dbms.startsWith(QLatin1String("SQLite"), Qt::CaseInsensitive);
}

QString ErpConnection::currentCatalog() const
{
    if (!m_h->connected)
        return QString();
    SQLWCHAR name[1024] = {};
    SQLSMALLINT len = 0;
    if (!SQL_SUCCEEDED(SQLGetInfoW(m_h->dbc, SQL_DATABASE_NAME, name, sizeof(name) - sizeof(SQLWCHAR), &len)))
        return QString();
    return fromWide(name, len / qsizetype(sizeof(SQLWCHAR)));
}

namespace {
// A column compared with a date literal, the column before the operator or
// after it. Only a plain (possibly qualified) name is recognised; anything
// else keeps the bare literal.
const QString kColumn = QStringLiteral("[A-Za-z_][A-Za-z0-9_]*(?:\\.[A-Za-z_][A-Za-z0-9_]*)*");
const QString kComparison = QStringLiteral("\\s*(?:<=|>=|<>|!=|=|<|>)\\s*");

// SQLite keeps a date as text, with or without a time ("2024-03-05" or
// "2024-03-05 00:00:00"), and compares text with text character by character,
// so a stored time would put a day after the literal of that same day. The
// literal names a day, so the column is taken to its day as well.
QString dayOf(const QString& column)
{
    return QStringLiteral("date(") + column + QLatin1Char(')');
}

bool isDateValue(const QVariant& v)
{
    const int type = v.typeId();
    return type == QMetaType::QDate || type == QMetaType::QDateTime;
}
} // namespace

QString ErpConnection::rewriteForSqlite(const QString& sql, const ErpParams& params)
{
    static const QRegularExpression dateLiteral(QStringLiteral("^#(\\d{1,2})/(\\d{1,2})/(\\d{4})#"));
    // END closes a CASE expression; it names no column.
    static const QRegularExpression columnBefore(QStringLiteral("(?<![\\w.\"])(?!(?i:END)\\b)(") + kColumn
                                                 + QStringLiteral(")(") + kComparison + QStringLiteral(")$"));
    static const QRegularExpression columnAfter(QStringLiteral("^(") + kComparison + QStringLiteral(")(") + kColumn
                                                + QStringLiteral(")(?![\\w.\"]|\\s*\\()"));
    QString out;
    out.reserve(sql.size());
    // A day in place of sql[i]: the column compared with it, before or after,
    // is taken to its day too.
    auto day = [&](const QString& value, int& i) {
        // The column sits just before the day: a look at the tail is enough.
        const auto before = columnBefore.match(out, std::max<qsizetype>(0, out.size() - 256));
        if (before.hasMatch()) {
            out.truncate(before.capturedStart());
            out += dayOf(before.captured(1)) + before.captured(2) + value;
            return;
        }
        const auto after = columnAfter.match(QStringView(sql).mid(i + 1));
        out += value;
        if (after.hasMatch()) {
            out += after.captured(1) + dayOf(after.captured(2));
            i += int(after.capturedLength());
        }
    };
    bool quoted = false;
    int marker = 0;
    for (int i = 0; i < sql.size(); ++i) {
        const QChar c = sql[i];
        if (quoted) {
            out += c;
            if (c == QLatin1Char('\''))
                quoted = false; // a doubled '' reopens at once on the next character
            continue;
        }
        if (c == QLatin1Char('\'')) {
            quoted = true;
            out += c;
            continue;
        }
        const bool wordStart = i == 0 || !(sql[i - 1].isLetterOrNumber() || sql[i - 1] == QLatin1Char('_'));
        if ((c == QLatin1Char('N') || c == QLatin1Char('n')) && wordStart && i + 1 < sql.size()
            && sql[i + 1] == QLatin1Char('\''))
            continue; // N'text' is 'text'
        if (c == QLatin1Char('?')) {
            if (marker < params.size() && isDateValue(params[marker]))
                day(QStringLiteral("?"), i);
            else
                out += c;
            ++marker;
            continue;
        }
        if (c == QLatin1Char('#')) {
            const auto m = dateLiteral.match(QStringView(sql).mid(i));
            if (m.hasMatch()) {
                const QDate d(m.captured(3).toInt(), m.captured(2).toInt(), m.captured(1).toInt());
                i += int(m.capturedLength()) - 1;
                day(QLatin1Char('\'') + d.toString(Qt::ISODate) + QLatin1Char('\''), i);
                continue;
            }
        }
        out += c;
    }
    return out;
}

QString ErpConnection::dialectSql(const QString& sql, const ErpParams& params) const
{
    return isSqlite() ? rewriteForSqlite(sql, params) : sql;
}

namespace {
// One value for a "?" marker, held where the driver reads it at execution.
struct BoundValue {
    std::u16string text;
    SQLINTEGER whole = 0;
    SQLBIGINT wide = 0;
    double real = 0;
    SQL_DATE_STRUCT date{};
    SQL_TIMESTAMP_STRUCT stamp{};
    SQLLEN indicator = 0;
};

// Binds every value to its marker; the values must stay where they are until
// the statement has run. SQLite keeps dates as text, so there a date goes out
// as the day's text, to meet the day the dialect takes the column to.
bool bindParams(SQLHSTMT stmt, const ErpParams& params, bool sqlite, std::vector<BoundValue>& bound, QString* error)
{
    bound.assign(size_t(params.size()), BoundValue());
    for (qsizetype n = 0; n < params.size(); ++n) {
        const QVariant& v = params[n];
        BoundValue& b = bound[size_t(n)];
        const SQLUSMALLINT marker = SQLUSMALLINT(n + 1);
        SQLRETURN rc = SQL_ERROR;
        const int type = v.typeId();
        auto bindText = [&](const QString& text) {
            b.text = wide(text);
            b.indicator = SQLLEN(b.text.size() * sizeof(char16_t));
            // A column size of 0 is refused by some drivers, even for empty text.
            const SQLULEN chars = std::max<SQLULEN>(1, b.text.size());
            return SQLBindParameter(stmt, marker, SQL_PARAM_INPUT, SQL_C_WCHAR,
                                    chars > 4000 ? SQL_WLONGVARCHAR : SQL_WVARCHAR, chars, 0, wptr(b.text),
                                    b.indicator, &b.indicator);
        };
        if (v.isNull()) {
            b.indicator = SQL_NULL_DATA;
            rc = SQLBindParameter(stmt, marker, SQL_PARAM_INPUT, SQL_C_WCHAR, SQL_WVARCHAR, 1, 0, nullptr, 0,
                                  &b.indicator);
        } else if (type == QMetaType::QString) {
            rc = bindText(v.toString());
        } else if (type == QMetaType::Int || type == QMetaType::Short || type == QMetaType::UShort
                   || type == QMetaType::Char || type == QMetaType::SChar || type == QMetaType::UChar
                   || type == QMetaType::Bool) {
            b.whole = SQLINTEGER(v.toInt());
            rc = SQLBindParameter(stmt, marker, SQL_PARAM_INPUT, SQL_C_SLONG, SQL_INTEGER, 0, 0, &b.whole, 0, nullptr);
        } else if (type == QMetaType::UInt || type == QMetaType::LongLong || type == QMetaType::ULongLong
                   || type == QMetaType::Long || type == QMetaType::ULong) {
            b.wide = SQLBIGINT(v.toLongLong());
            rc = SQLBindParameter(stmt, marker, SQL_PARAM_INPUT, SQL_C_SBIGINT, SQL_BIGINT, 0, 0, &b.wide, 0, nullptr);
        } else if (type == QMetaType::Double || type == QMetaType::Float) {
            b.real = v.toDouble();
            rc = SQLBindParameter(stmt, marker, SQL_PARAM_INPUT, SQL_C_DOUBLE, SQL_DOUBLE, 0, 0, &b.real, 0, nullptr);
        } else if (isDateValue(v) && sqlite) {
            const QDate d = type == QMetaType::QDate ? v.toDate() : v.toDateTime().date();
            rc = bindText(d.toString(Qt::ISODate));
        } else if (type == QMetaType::QDate) {
            const QDate d = v.toDate();
            b.date = {SQLSMALLINT(d.year()), SQLUSMALLINT(d.month()), SQLUSMALLINT(d.day())};
            rc = SQLBindParameter(stmt, marker, SQL_PARAM_INPUT, SQL_C_TYPE_DATE, SQL_TYPE_DATE, 10, 0, &b.date, 0,
                                  nullptr);
        } else if (type == QMetaType::QDateTime) {
            const QDateTime t = v.toDateTime();
            b.stamp = {SQLSMALLINT(t.date().year()), SQLUSMALLINT(t.date().month()), SQLUSMALLINT(t.date().day()),
                       SQLUSMALLINT(t.time().hour()), SQLUSMALLINT(t.time().minute()), SQLUSMALLINT(t.time().second()),
                       0};
            rc = SQLBindParameter(stmt, marker, SQL_PARAM_INPUT, SQL_C_TYPE_TIMESTAMP, SQL_TYPE_TIMESTAMP, 19, 0,
                                  &b.stamp, 0, nullptr);
        } else {
            if (error)
                *error = QStringLiteral("value %1 of the query has a kind the ERP query cannot take (%2)")
                             .arg(n + 1)
                             .arg(QLatin1String(v.typeName()));
            return false;
        }
        if (!SQL_SUCCEEDED(rc)) {
            if (error)
                *error = diagnostics(SQL_HANDLE_STMT, stmt);
            return false;
        }
    }
    return true;
}
} // namespace

std::unique_ptr<ErpRecordset> ErpConnection::query(const QString& sql, const ErpParams& params, QString* error)
{
    if (!m_h->connected) {
        if (error)
            *error = QStringLiteral("not connected");
        return nullptr;
    }
    // Not every driver honours the read-only mode, so the guarantee that
    // nothing is ever written to the ERP is kept here: only queries go out.
    static const QRegularExpression queryStart(QStringLiteral("^\\s*\\(*\\s*(SELECT|WITH)\\b"),
                                               QRegularExpression::CaseInsensitiveOption);
    if (!queryStart.match(sql).hasMatch()) {
        if (error)
            *error = QStringLiteral("only queries are sent to the ERP database: %1").arg(sql.left(60));
        return nullptr;
    }
    SQLHSTMT stmt = SQL_NULL_HSTMT;
    if (!SQL_SUCCEEDED(SQLAllocHandle(SQL_HANDLE_STMT, m_h->dbc, &stmt))) {
        if (error)
            *error = diagnostics(SQL_HANDLE_DBC, m_h->dbc);
        return nullptr;
    }
    SQLSetStmtAttr(stmt, SQL_ATTR_CURSOR_TYPE, reinterpret_cast<SQLPOINTER>(SQL_CURSOR_FORWARD_ONLY), 0);
    SQLSetStmtAttr(stmt, SQL_ATTR_CONCURRENCY, reinterpret_cast<SQLPOINTER>(SQL_CONCUR_READ_ONLY), 0);
    SQLSetStmtAttr(stmt, SQL_ATTR_QUERY_TIMEOUT, reinterpret_cast<SQLPOINTER>(static_cast<SQLULEN>(m_timeout)), 0);
    std::vector<BoundValue> bound;
    if (!bindParams(stmt, params, isSqlite(), bound, error)) {
        SQLFreeHandle(SQL_HANDLE_STMT, stmt);
        return nullptr;
    }
    std::u16string text = wide(dialectSql(sql, params));
    const SQLRETURN rc = SQLExecDirectW(stmt, wptr(text), SQLINTEGER(text.size()));
    if (!SQL_SUCCEEDED(rc) && rc != SQL_NO_DATA) {
        if (error)
            *error = diagnostics(SQL_HANDLE_STMT, stmt);
        SQLFreeHandle(SQL_HANDLE_STMT, stmt);
        return nullptr;
    }
    // The values die with this call; the driver has taken them by now.
    SQLFreeStmt(stmt, SQL_RESET_PARAMS);
    std::unique_ptr<ErpRecordset> rs(new ErpRecordset(stmt));
    if (!rs->describe()) {
        if (error)
            *error = rs->error();
        return nullptr;
    }
    if (error)
        error->clear();
    return rs;
}

long long ErpConnection::countRows(const QString& sql, const ErpParams& params, QString* error)
{
    QString e;
    auto rs = query(QStringLiteral("SELECT COUNT(*) FROM (%1) TagoraCount").arg(withoutOrderBy(sql)), params, &e);
    if (!rs || !rs->next()) {
        if (error)
            *error = rs ? rs->error() : e;
        return -1;
    }
    return rs->value(0).toLongLong();
}

// ------------------------------------------------------------------ recordset

ErpRecordset::ErpRecordset(void* stmt)
    : m_stmt(stmt)
{
}

ErpRecordset::~ErpRecordset()
{
    if (m_stmt) {
        SQLCloseCursor(static_cast<SQLHSTMT>(m_stmt));
        SQLFreeHandle(SQL_HANDLE_STMT, static_cast<SQLHSTMT>(m_stmt));
    }
}

bool ErpRecordset::describe()
{
    auto* stmt = static_cast<SQLHSTMT>(m_stmt);
    SQLSMALLINT n = 0;
    if (!SQL_SUCCEEDED(SQLNumResultCols(stmt, &n))) {
        m_error = diagnostics(SQL_HANDLE_STMT, stmt);
        return false;
    }
    m_columns.reserve(size_t(n));
    for (SQLUSMALLINT i = 1; i <= SQLUSMALLINT(n); ++i) {
        SQLWCHAR name[256] = {};
        SQLSMALLINT nameLen = 0, type = 0, digits = 0, nullable = 0;
        SQLULEN size = 0;
        SQLDescribeColW(stmt, i, name, 255, &nameLen, &type, &size, &digits, &nullable);
        m_columns.push_back({fromWide(name, std::min<qsizetype>(nameLen, 255)), type});
    }
    m_row.resize(m_columns.size());
    return true;
}

int ErpRecordset::columnIndex(const QString& name) const
{
    for (size_t i = 0; i < m_columns.size(); ++i)
        if (m_columns[i].name.compare(name, Qt::CaseInsensitive) == 0)
            return int(i);
    // A qualified column (PART.PARTNAME) comes back under its own name.
    const int dot = name.lastIndexOf(QLatin1Char('.'));
    if (dot >= 0)
        return columnIndex(name.mid(dot + 1));
    return -1;
}

QVariant ErpRecordset::value(const QString& name) const
{
    const int i = columnIndex(name);
    return i >= 0 ? m_row[size_t(i)] : QVariant();
}

bool ErpRecordset::next()
{
    auto* stmt = static_cast<SQLHSTMT>(m_stmt);
    if (m_columns.empty())
        return false;
    const SQLRETURN rc = SQLFetch(stmt);
    if (rc == SQL_NO_DATA)
        return false;
    if (!SQL_SUCCEEDED(rc)) {
        m_error = diagnostics(SQL_HANDLE_STMT, stmt);
        return false;
    }
    for (size_t i = 0; i < m_columns.size(); ++i) {
        m_row[i] = fetchValue(int(i));
        if (!m_error.isEmpty())
            return false;
    }
    return true;
}

QVariant ErpRecordset::fetchValue(int i)
{
    auto* stmt = static_cast<SQLHSTMT>(m_stmt);
    const SQLUSMALLINT col = SQLUSMALLINT(i + 1);
    SQLLEN ind = 0;
    auto check = [&](SQLRETURN rc) {
        if (!SQL_SUCCEEDED(rc)) {
            m_error = diagnostics(SQL_HANDLE_STMT, stmt);
            return false;
        }
        return true;
    };
    switch (m_columns[size_t(i)].sqlType) {
    case SQL_INTEGER:
    case SQL_SMALLINT:
    case SQL_TINYINT:
    case SQL_BIGINT:
    case SQL_BIT: {
        SQLBIGINT v = 0;
        if (!check(SQLGetData(stmt, col, SQL_C_SBIGINT, &v, sizeof(v), &ind)) || ind == SQL_NULL_DATA)
            return QVariant();
        return QVariant(qlonglong(v));
    }
    case SQL_REAL:
    case SQL_FLOAT:
    case SQL_DOUBLE:
    case SQL_NUMERIC:
    case SQL_DECIMAL: {
        double v = 0;
        if (!check(SQLGetData(stmt, col, SQL_C_DOUBLE, &v, sizeof(v), &ind)) || ind == SQL_NULL_DATA)
            return QVariant();
        return QVariant(v);
    }
    case SQL_TYPE_DATE:
    case SQL_DATE: {
        SQL_DATE_STRUCT d{};
        if (!check(SQLGetData(stmt, col, SQL_C_TYPE_DATE, &d, sizeof(d), &ind)) || ind == SQL_NULL_DATA)
            return QVariant();
        return QVariant(QDate(d.year, d.month, d.day));
    }
    case SQL_TYPE_TIMESTAMP:
    case SQL_TIMESTAMP: {
        SQL_TIMESTAMP_STRUCT t{};
        if (!check(SQLGetData(stmt, col, SQL_C_TYPE_TIMESTAMP, &t, sizeof(t), &ind)) || ind == SQL_NULL_DATA)
            return QVariant();
        return QVariant(QDateTime(QDate(t.year, t.month, t.day), QTime(t.hour, t.minute, t.second)));
    }
    default: {
        // Text of any length, read in pieces.
        QString text;
        SQLWCHAR buf[1024];
        for (;;) {
            const SQLRETURN rc = SQLGetData(stmt, col, SQL_C_WCHAR, buf, sizeof(buf), &ind);
            if (rc == SQL_NO_DATA)
                break;
            if (!check(rc))
                return QVariant();
            if (ind == SQL_NULL_DATA)
                return QVariant();
            const qsizetype maxChars = qsizetype(sizeof(buf) / sizeof(SQLWCHAR)) - 1;
            qsizetype chars = maxChars;
            if (ind != SQL_NO_TOTAL && ind / qsizetype(sizeof(SQLWCHAR)) < maxChars)
                chars = ind / qsizetype(sizeof(SQLWCHAR));
            text += fromWide(buf, chars);
            if (rc == SQL_SUCCESS)
                break;
        }
        return QVariant(text);
    }
    }
}

} // namespace tagora
