#include "erp/odbc.h"

#include <QDate>
#include <QDateTime>
#include <QFile>
#include <QFileInfo>
#include <QRegularExpression>
#include <QSet>

#include <algorithm>
#include <cmath>

#include <pwd.h>
#include <sql.h>
#include <sqlext.h>
#include <sqlucode.h>
#include <unistd.h>

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

// ------------------------------------------------------------ the query guard

// Words that start or carry a write, a change of schema or session, or a call
// into the server, in any of the servers the ERP may sit on. A read never needs
// them outside a literal or a quoted name; SQL Server runs a batch without ";",
// so they are refused wherever they stand, not only at the start.
const QSet<QString>& writeWords()
{
    static const QSet<QString> words = {
        QStringLiteral("INSERT"),   QStringLiteral("UPDATE"),     QStringLiteral("DELETE"),
        QStringLiteral("MERGE"),    QStringLiteral("UPSERT"),     QStringLiteral("INTO"),
        QStringLiteral("CREATE"),   QStringLiteral("DROP"),       QStringLiteral("ALTER"),
        QStringLiteral("TRUNCATE"), QStringLiteral("RENAME"),     QStringLiteral("GRANT"),
        QStringLiteral("REVOKE"),   QStringLiteral("DENY"),       QStringLiteral("ATTACH"),
        QStringLiteral("DETACH"),   QStringLiteral("PRAGMA"),     QStringLiteral("VACUUM"),
        QStringLiteral("REINDEX"),  QStringLiteral("ANALYZE"),    QStringLiteral("COPY"),
        QStringLiteral("CALL"),     QStringLiteral("EXEC"),       QStringLiteral("EXECUTE"),
        QStringLiteral("DECLARE"),  QStringLiteral("SET"),        QStringLiteral("LOCK"),
        QStringLiteral("BEGIN"),    QStringLiteral("COMMIT"),     QStringLiteral("ROLLBACK"),
        QStringLiteral("SAVEPOINT"), QStringLiteral("RELEASE"),   QStringLiteral("PREPARE"),
        QStringLiteral("DEALLOCATE"), QStringLiteral("NOTIFY"),   QStringLiteral("LISTEN"),
        QStringLiteral("REFRESH"),  QStringLiteral("CLUSTER"),    QStringLiteral("DBCC"),
        QStringLiteral("BACKUP"),   QStringLiteral("RESTORE"),    QStringLiteral("SHUTDOWN"),
        QStringLiteral("KILL"),
    };
    return words;
}

bool isWordChar(QChar c)
{
    return c.isLetterOrNumber() || c == QLatin1Char('_') || c == QLatin1Char('$');
}

// The one statement of a text that only reads, without a closing ";" and
// what follows it, and with each comment made a blank (the SQLite driver
// splits statements at a ";" even inside a comment); empty with the reason
// when the text is anything else.
// Literals, quoted names and comments are skipped as the servers read them;
// where the servers read a form differently (a backslash in a literal, a
// comment opened inside a comment, a dollar-quoted string) the text is refused
// rather than guessed at.
QString readOnlyStatement(const QString& sql, QString* reason)
{
    auto refuse = [&](const QString& why) {
        *reason = why;
        return QString();
    };
    QString first;
    QString out;
    int end = -1;
    int copied = 0; // sql up to here is in out
    auto blankOut = [&](int from, int to) {
        if (end >= 0)
            return; // past the statement: dropped with the rest
        out += QStringView(sql).mid(copied, from - copied);
        out += QLatin1Char(' ');
        copied = to;
    };
    const int n = int(sql.size());
    for (int i = 0; i < n;) {
        const QChar c = sql[i];
        const QChar next = i + 1 < n ? sql[i + 1] : QChar();
        if (c.isSpace()) {
            ++i;
        } else if (c == QLatin1Char('-') && next == QLatin1Char('-')) {
            const int start = i;
            while (i < n && sql[i] != QLatin1Char('\n'))
                ++i;
            blankOut(start, i);
        } else if (c == QLatin1Char('/') && next == QLatin1Char('*')) {
            const int close = int(sql.indexOf(QLatin1String("*/"), i + 2));
            if (close < 0)
                return refuse(QStringLiteral("הערה שלא נסגרה"));
            if (sql.indexOf(QLatin1String("/*"), i + 2) >= 0 && sql.indexOf(QLatin1String("/*"), i + 2) < close)
                return refuse(QStringLiteral("הערה בתוך הערה"));
            blankOut(i, close + 2);
            i = close + 2;
        } else if (c == QLatin1Char('\'') || c == QLatin1Char('"') || c == QLatin1Char('`') || c == QLatin1Char('[')) {
            if (end >= 0)
                return refuse(QStringLiteral("יותר מפקודה אחת"));
            if (first.isEmpty())
                return refuse(QStringLiteral("אינה שאילתה"));
            const QChar closing = c == QLatin1Char('[') ? QLatin1Char(']') : c;
            int j = i + 1;
            for (;; ++j) {
                if (j >= n)
                    return refuse(QStringLiteral("מחרוזת או שם במירכאות שלא נסגרו"));
                if (c == QLatin1Char('\'') && sql[j] == QLatin1Char('\\'))
                    return refuse(QStringLiteral("לוכסן הפוך בתוך מחרוזת"));
                if (sql[j] == closing) {
                    if (j + 1 < n && sql[j + 1] == closing) {
                        ++j; // doubled: part of the text
                        continue;
                    }
                    break;
                }
            }
            i = j + 1;
        } else if (c == QLatin1Char(';')) {
            if (end >= 0)
                return refuse(QStringLiteral("יותר מפקודה אחת"));
            end = i++;
        } else if (isWordChar(c)) {
            if (end >= 0)
                return refuse(QStringLiteral("יותר מפקודה אחת"));
            if (c == QLatin1Char('$'))
                return refuse(QStringLiteral("מחרוזת בסימני דולר"));
            int j = i;
            while (j < n && isWordChar(sql[j]))
                ++j;
            const QString word = sql.mid(i, j - i).toUpper();
            if (first.isEmpty())
                first = word;
            if (writeWords().contains(word))
                return refuse(QStringLiteral("המילה %1").arg(word));
            i = j;
        } else {
            if (end >= 0)
                return refuse(QStringLiteral("יותר מפקודה אחת"));
            if (first.isEmpty() && c != QLatin1Char('('))
                return refuse(QStringLiteral("אינה שאילתה"));
            ++i;
        }
    }
    if (first != QLatin1String("SELECT") && first != QLatin1String("WITH"))
        return refuse(QStringLiteral("אינה שאילתה"));
    out += QStringView(sql).mid(copied, (end >= 0 ? end : n) - copied);
    return out;
}

// ------------------------------------------------------- the connection text

struct ConnPair {
    QString key;
    QString value;
    bool braced = false;
};

// The pairs of an ODBC connection text as the standard reads it: a value in
// braces runs to the closing brace, with "}}" standing for one.
QList<ConnPair> connPairs(const QString& text)
{
    QList<ConnPair> out;
    const int n = int(text.size());
    int i = 0;
    while (i < n) {
        const int eq = int(text.indexOf(QLatin1Char('='), i));
        const int semi = int(text.indexOf(QLatin1Char(';'), i));
        if (eq < 0 || (semi >= 0 && semi < eq)) {
            i = semi < 0 ? n : semi + 1;
            continue;
        }
        ConnPair p;
        p.key = text.mid(i, eq - i).trimmed();
        int j = eq + 1;
        if (j < n && text[j] == QLatin1Char('{')) {
            p.braced = true;
            for (++j; j < n; ++j) {
                if (text[j] == QLatin1Char('}')) {
                    if (j + 1 < n && text[j + 1] == QLatin1Char('}')) {
                        p.value += QLatin1Char('}');
                        ++j;
                        continue;
                    }
                    ++j;
                    break;
                }
                p.value += text[j];
            }
            const int after = int(text.indexOf(QLatin1Char(';'), j));
            i = after < 0 ? n : after + 1;
        } else {
            const int after = int(text.indexOf(QLatin1Char(';'), j));
            p.value = text.mid(j, (after < 0 ? n : after) - j);
            i = after < 0 ? n : after + 1;
        }
        out << p;
    }
    return out;
}

QString pairValue(const QList<ConnPair>& pairs, const char* key)
{
    for (const ConnPair& p : pairs)
        if (p.key.compare(QLatin1String(key), Qt::CaseInsensitive) == 0)
            return p.value;
    return QString();
}

// unixODBC keeps what it once read of its files for the life of the process
// (a data source added or changed since is not seen), so the files are read
// here afresh, where unixODBC looks for them.
QString iniValue(const QString& file, const QString& section, const QString& key)
{
    QFile f(file);
    if (section.isEmpty() || !f.open(QIODevice::ReadOnly | QIODevice::Text))
        return QString();
    bool inSection = false;
    while (!f.atEnd()) {
        const QString line = QString::fromUtf8(f.readLine()).trimmed();
        if (line.startsWith(QLatin1Char('['))) {
            const int close = int(line.indexOf(QLatin1Char(']')));
            inSection = close > 0 && line.mid(1, close - 1).trimmed().compare(section, Qt::CaseInsensitive) == 0;
            continue;
        }
        if (!inSection || line.startsWith(QLatin1Char(';')) || line.startsWith(QLatin1Char('#')))
            continue;
        const int eq = int(line.indexOf(QLatin1Char('=')));
        if (eq > 0 && line.left(eq).trimmed().compare(key, Qt::CaseInsensitive) == 0)
            return line.mid(eq + 1).trimmed();
    }
    return QString();
}

QString systemIniFolder()
{
    const QString dir = qEnvironmentVariable("ODBCSYSINI");
    return dir.isEmpty() ? QStringLiteral("/etc") : dir;
}

// A data source's entry: the user's file first, as the driver manager reads them.
QString dsnValue(const QString& dsn, const QString& key)
{
    QString user = qEnvironmentVariable("ODBCINI");
    if (user.isEmpty()) {
        // unixODBC takes the home folder from the passwd entry, not $HOME.
        const passwd* pw = getpwuid(getuid());
        user = QString::fromLocal8Bit(pw ? pw->pw_dir : "") + QStringLiteral("/.odbc.ini");
    }
    const QString v = iniValue(user, dsn, key);
    return v.isEmpty() ? iniValue(systemIniFolder() + QStringLiteral("/odbc.ini"), dsn, key) : v;
}

QString driverValue(const QString& driver, const QString& key)
{
    QString name = qEnvironmentVariable("ODBCINSTINI");
    if (name.isEmpty())
        name = QStringLiteral("odbcinst.ini");
    return iniValue(systemIniFolder() + QLatin1Char('/') + name, driver, key);
}

// What the driver manager will load for a connection text, found before
// connecting: the text's own DRIVER, or the data source's Driver entry (a
// name in odbcinst.ini or a library path).
enum class DriverKind { Sqlite, Other, Unknown };
struct DriverTarget {
    DriverKind kind = DriverKind::Unknown;
    QString database; // the SQLite file the driver will open
};

DriverTarget driverTarget(const QList<ConnPair>& pairs)
{
    DriverTarget t;
    QString driver = pairValue(pairs, "DRIVER");
    QString dsn = pairValue(pairs, "DSN");
    if (driver.isEmpty()) {
        if (dsn.isEmpty())
            dsn = QStringLiteral("Default");
        driver = dsnValue(dsn, QStringLiteral("Driver"));
    }
    if (driver.isEmpty())
        return t;
    QString library = driverValue(driver, QStringLiteral("Driver"));
    if (library.isEmpty())
        library = driver;
    const bool sqlite = driver.contains(QLatin1String("sqlite"), Qt::CaseInsensitive)
        || QFileInfo(library).fileName().contains(QLatin1String("sqlite"), Qt::CaseInsensitive);
    t.kind = sqlite ? DriverKind::Sqlite : DriverKind::Other;
    if (sqlite) {
        // The driver takes the first Database it finds in the text, else the data source's.
        t.database = pairValue(pairs, "Database");
        if (t.database.isEmpty() && !dsn.isEmpty())
            t.database = dsnValue(dsn, QStringLiteral("Database"));
    }
    return t;
}

QString connKeyName(const QString& key)
{
    const QString k = key.toLower();
    if (k == QLatin1String("uid") || k == QLatin1String("user") || k == QLatin1String("username"))
        return QStringLiteral("שם המשתמש");
    if (k == QLatin1String("pwd") || k == QLatin1String("password"))
        return QStringLiteral("הסיסמה");
    if (k == QLatin1String("dsn"))
        return QStringLiteral("שם מקור הנתונים");
    return QStringLiteral("הערך %1").arg(key);
}

// The SQLite ODBC driver splits the text at every ";" and reads braces as
// part of the value, so a value that needs braces would be cut into keys of
// its own (LoadExt, Database). Such a value is refused before connecting, for
// that driver and for one that cannot be told.
QString unsafeForSqlite(const QList<ConnPair>& pairs)
{
    for (const ConnPair& p : pairs) {
        const QString& v = p.value;
        const bool blankEnds = !v.isEmpty() && (v.front().isSpace() || v.back().isSpace());
        const bool special = v.contains(QLatin1Char(';')) || v.contains(QLatin1Char('{')) || v.contains(QLatin1Char('}'));
        if (special || blankEnds || (p.braced && p.key.compare(QLatin1String("DRIVER"), Qt::CaseInsensitive) != 0))
            return QStringLiteral("%1 מכיל תו שמנהל ההתקן של מקור הנתונים אינו יכול לקבל בבטחה (; { } או רווח בתחילה "
                                  "או בסוף), ולכן לא נוצר חיבור ל-ERP. יש לתקן את הערך בהגדרות החיבור.")
                .arg(connKeyName(p.key));
    }
    return QString();
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
    m_deadline = timeoutSeconds > 0 ? QDeadlineTimer(qint64(timeoutSeconds) * 1000) : QDeadlineTimer(QDeadlineTimer::Forever);
    m_busyWaitSet = -1;
    auto fail = [&](SQLSMALLINT type, SQLHANDLE handle) {
        if (error)
            *error = diagnostics(type, handle);
        close();
        return false;
    };
    auto refuse = [&](const QString& message) {
        if (error)
            *error = message;
        close();
        return false;
    };

    QString connText = connectionText;
    const QList<ConnPair> pairs = connPairs(connectionText);
    const DriverTarget target = driverTarget(pairs);
    if (target.kind != DriverKind::Other) {
        const QString unsafe = unsafeForSqlite(pairs);
        if (!unsafe.isEmpty())
            return refuse(unsafe);
    }
    if (target.kind == DriverKind::Sqlite) {
        // The driver would create an empty file and report nothing; the ERP
        // that is not there is reported as such.
        if (!target.database.isEmpty() && !QFileInfo::exists(target.database))
            return refuse(QStringLiteral("קובץ מסד הנתונים של ה-ERP לא נמצא: %1").arg(target.database));
        // The driver's own busy wait (100 s unless told) outlasts the
        // operation's time-out on a locked file; it takes the first key it
        // finds, so these go in front of whatever the text holds. Without
        // StepAPI the driver fetches a whole result before the first row, so
        // its memory grows with the ERP.
        QString keys = QStringLiteral("NoCreat=1;StepAPI=1;");
        if (timeoutSeconds > 0)
            keys += QStringLiteral("Timeout=%1;").arg(qint64(timeoutSeconds) * 1000);
        connText = keys + connText;
    }
    if (!SQL_SUCCEEDED(SQLAllocHandle(SQL_HANDLE_ENV, SQL_NULL_HANDLE, &m_h->env)))
        return fail(SQL_HANDLE_ENV, m_h->env);
    SQLSetEnvAttr(m_h->env, SQL_ATTR_ODBC_VERSION, reinterpret_cast<SQLPOINTER>(SQL_OV_ODBC3), 0);
    if (!SQL_SUCCEEDED(SQLAllocHandle(SQL_HANDLE_DBC, m_h->env, &m_h->dbc)))
        return fail(SQL_HANDLE_ENV, m_h->env);
    const auto seconds = reinterpret_cast<SQLPOINTER>(static_cast<SQLULEN>(timeoutSeconds));
    SQLSetConnectAttr(m_h->dbc, SQL_ATTR_LOGIN_TIMEOUT, seconds, 0);
    SQLSetConnectAttr(m_h->dbc, SQL_ATTR_CONNECTION_TIMEOUT, seconds, 0);
    SQLSetConnectAttr(m_h->dbc, SQL_ATTR_ACCESS_MODE, reinterpret_cast<SQLPOINTER>(SQL_MODE_READ_ONLY), 0);

    std::u16string text = wide(connText);
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

    // Neither driver honours the read-only mode, so the server itself is told
    // to refuse writes; a session that cannot be made so is not used.
    QString message;
    if (isSqlite()) {
        // Reading the schema also meets a locked or damaged file now, with
        // the driver's message, rather than at the first query.
        if (!execute(QStringLiteral("PRAGMA query_only = ON"), &message)
            || !execute(QStringLiteral("SELECT count(*) FROM sqlite_master"), &message))
            return refuse(message);
    } else if (m_dbms.startsWith(QLatin1String("PostgreSQL"), Qt::CaseInsensitive)) {
        if (!execute(QStringLiteral("SET SESSION CHARACTERISTICS AS TRANSACTION READ ONLY"), &message))
            return refuse(message);
    }
    return true;
}

void ErpConnection::restartTimeout()
{
    if (m_timeout <= 0)
        return;
    m_deadline = QDeadlineTimer(qint64(m_timeout) * 1000);
    m_busyWaitSet = -1;
}

int ErpConnection::remainingSeconds() const
{
    if (m_timeout <= 0)
        return 0;
    // At least a second: 0 would mean no limit at all.
    return int(std::max<qint64>(1, (m_deadline.remainingTime() + 999) / 1000));
}

void* ErpConnection::newStatement(QString* error)
{
    SQLHSTMT stmt = SQL_NULL_HSTMT;
    if (!SQL_SUCCEEDED(SQLAllocHandle(SQL_HANDLE_STMT, m_h->dbc, &stmt))) {
        if (error)
            *error = diagnostics(SQL_HANDLE_DBC, m_h->dbc);
        return nullptr;
    }
    SQLSetStmtAttr(stmt, SQL_ATTR_QUERY_TIMEOUT, reinterpret_cast<SQLPOINTER>(static_cast<SQLULEN>(remainingSeconds())),
                   0);
    return stmt;
}

bool ErpConnection::execute(const QString& sql, QString* error)
{
    auto* stmt = static_cast<SQLHSTMT>(newStatement(error));
    if (!stmt)
        return false;
    std::u16string text = wide(sql);
    const SQLRETURN rc = SQLExecDirectW(stmt, wptr(text), SQLINTEGER(text.size()));
    const bool ok = SQL_SUCCEEDED(rc) || rc == SQL_NO_DATA;
    if (!ok && error)
        *error = diagnostics(SQL_HANDLE_STMT, stmt);
    SQLFreeHandle(SQL_HANDLE_STMT, stmt);
    return ok;
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

namespace {
// A value as SQLite literal text, or empty when it has none that is safe.
QString sqliteLiteral(const QVariant& v)
{
    if (v.isNull())
        return QStringLiteral("NULL");
    switch (v.typeId()) {
    case QMetaType::Bool:
        return v.toBool() ? QStringLiteral("1") : QStringLiteral("0");
    case QMetaType::Int:
    case QMetaType::Short:
    case QMetaType::UShort:
    case QMetaType::Char:
    case QMetaType::SChar:
    case QMetaType::UChar:
    case QMetaType::UInt:
    case QMetaType::Long:
    case QMetaType::LongLong:
        return QString::number(v.toLongLong());
    case QMetaType::Double:
    case QMetaType::Float: {
        const double d = v.toDouble();
        // Seventeen digits give the same double back; an integral value
        // keeps a decimal point so SQLite reads it as the real it was bound as.
        if (!std::isfinite(d))
            return QString();
        QString t = QString::number(d, 'g', 17);
        if (!t.contains(QLatin1Char('.')) && !t.contains(QLatin1Char('e')))
            t += QStringLiteral(".0");
        return t;
    }
    case QMetaType::QString: {
        QString t = v.toString();
        // The driver turns the statement's wide text into its own by single
        // units: a character beyond 16 bits would come out broken, and might
        // take the closing apostrophe with it. Such a value is bound instead.
        for (const QChar ch : std::as_const(t))
            if (ch.isNull() || ch.isSurrogate())
                return QString();
        t.replace(QLatin1Char('\''), QStringLiteral("''"));
        return QLatin1Char('\'') + t + QLatin1Char('\'');
    }
    case QMetaType::QDate:
    case QMetaType::QDateTime: {
        const QDate d = v.typeId() == QMetaType::QDate ? v.toDate() : v.toDateTime().date();
        return d.isValid() ? QLatin1Char('\'') + d.toString(Qt::ISODate) + QLatin1Char('\'') : QString();
    }
    default:
        return QString();
    }
}

// SQLite's driver reads the whole result into memory before the first row
// when a statement has parameters, and steps row by row when it has none;
// on a large ERP that is the import's memory. So for SQLite alone the values
// are written into the text as SQLite literals. A text goes between
// apostrophes with each apostrophe doubled, which is the whole of SQLite's
// literal syntax (a backslash escapes nothing there), so a value cannot end
// its literal early. Markers are found as SQLite finds them: not inside a
// literal, a quoted name or a comment. Empty when a value has no safe literal
// form (a NUL in a text, say) or the markers do not match the values: they
// are then bound, as for every other server.
} // namespace

QString ErpConnection::inlineSqliteValues(const QString& sql, const ErpParams& params)
{
    QString out;
    out.reserve(sql.size() + 16 * params.size());
    qsizetype marker = 0;
    const qsizetype n = sql.size();
    for (qsizetype i = 0; i < n; ++i) {
        const QChar c = sql[i];
        auto copyUntil = [&](QStringView close) {
            const qsizetype end = sql.indexOf(close, i + 1);
            const qsizetype stop = end < 0 ? n : end + close.size();
            out += QStringView(sql).mid(i, stop - i);
            i = stop - 1;
        };
        if (c == QLatin1Char('\'') ) {
            copyUntil(u"'"); // a doubled '' closes and reopens at once
        } else if (c == QLatin1Char('"')) {
            copyUntil(u"\"");
        } else if (c == QLatin1Char('`')) {
            copyUntil(u"`");
        } else if (c == QLatin1Char('[')) {
            copyUntil(u"]");
        } else if (c == QLatin1Char('-') && i + 1 < n && sql[i + 1] == QLatin1Char('-')) {
            copyUntil(u"\n");
        } else if (c == QLatin1Char('/') && i + 1 < n && sql[i + 1] == QLatin1Char('*')) {
            copyUntil(u"*/");
        } else if (c == QLatin1Char('?')) {
            if (marker >= params.size() || (i + 1 < n && sql[i + 1].isDigit()))
                return QString();
            const QString literal = sqliteLiteral(params[marker++]);
            if (literal.isEmpty())
                return QString();
            // Spaces keep the literal a word of its own whatever is beside it.
            out += QLatin1Char(' ') + literal + QLatin1Char(' ');
        } else {
            out += c;
        }
    }
    return marker == params.size() ? out : QString();
}

std::unique_ptr<ErpRecordset> ErpConnection::query(const QString& sql, const ErpParams& params, QString* error)
{
    if (!m_h->connected) {
        if (error)
            *error = QStringLiteral("not connected");
        return nullptr;
    }
    // The server is told to refuse writes, and the guard here keeps that
    // promise on a server that was not: one statement that only reads.
    QString reason;
    const QString statement = readOnlyStatement(sql, &reason);
    if (statement.isEmpty()) {
        if (error)
            *error = QStringLiteral("למסד הנתונים של ה-ERP נשלחות רק שאילתות קריאה (%1): %2").arg(reason, sql.left(60));
        return nullptr;
    }
    // The operation's time-out is one budget: each statement waits only for
    // what the ones before it left, a locked SQLite file included.
    if (isSqlite() && m_timeout > 0
        && (m_busyWaitSet < 0 || !m_busyWaitSince.isValid() || m_busyWaitSince.elapsed() > 1000)) {
        const qint64 ms = std::max<qint64>(1, m_deadline.remainingTime());
        if (!execute(QStringLiteral("PRAGMA busy_timeout = %1").arg(ms), error))
            return nullptr;
        m_busyWaitSet = ms;
        m_busyWaitSince.start();
    }
    auto* stmt = static_cast<SQLHSTMT>(newStatement(error));
    if (!stmt)
        return nullptr;
    SQLSetStmtAttr(stmt, SQL_ATTR_CURSOR_TYPE, reinterpret_cast<SQLPOINTER>(SQL_CURSOR_FORWARD_ONLY), 0);
    SQLSetStmtAttr(stmt, SQL_ATTR_CONCURRENCY, reinterpret_cast<SQLPOINTER>(SQL_CONCUR_READ_ONLY), 0);
    QString sent = dialectSql(statement, params);
    ErpParams toBind = params;
    if (isSqlite() && !params.isEmpty()) {
        const QString withLiterals = inlineSqliteValues(sent, params);
        if (!withLiterals.isEmpty()) {
            sent = withLiterals;
            toBind.clear();
        }
    }
    std::vector<BoundValue> bound;
    if (!bindParams(stmt, toBind, isSqlite(), bound, error)) {
        SQLFreeHandle(SQL_HANDLE_STMT, stmt);
        return nullptr;
    }
    std::u16string text = wide(sent);
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
    QString reason;
    const QString statement = readOnlyStatement(sql, &reason);
    // A closing ";" or a comment would end the derived table early.
    const QString inner = withoutOrderBy(statement.isEmpty() ? sql : statement);
    auto rs = query(QStringLiteral("SELECT COUNT(*) FROM (%1) TagoraCount").arg(inner), params, &e);
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
