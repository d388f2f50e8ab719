#include "localdb/database.h"

#include <QDate>
#include <QDateTime>
#include <QDir>
#include <QFileInfo>
#include <QTime>

#include <sqlite3.h>

namespace tagora {

namespace {
int s_busyTimeoutMs = 5000;

// The engine counts every allocation under one process-wide lock, for
// figures this program never reads. An import runs two connections at once
// (the ERP's SQLite driver reads while the local file is written), and that
// lock was where the two threads met. It can only be turned off before the
// engine starts, so it is done while the program loads.
const bool s_engineConfigured = [] { return sqlite3_config(SQLITE_CONFIG_MEMSTATUS, 0) == SQLITE_OK; }();

QString quotedName(const QString& name)
{
    QString n = name;
    n.replace(QLatin1Char('"'), QLatin1String("\"\""));
    return QLatin1Char('"') + n + QLatin1Char('"');
}

QString objectNotFound(const QString& object, const QString& path)
{
    return QStringLiteral("לא ניתן למצוא את האובייקט '%1' בקובץ '%2'. ודאו שהאובייקט קיים ושהנתיב נכון.")
        .arg(object, QDir::toNativeSeparators(path));
}

bool isSelect(const QString& sql)
{
    QString t = sql.trimmed();
    while (t.startsWith(QLatin1Char('(')))
        t = t.mid(1).trimmed();
    return t.startsWith(QLatin1String("SELECT"), Qt::CaseInsensitive)
        || t.startsWith(QLatin1String("WITH"), Qt::CaseInsensitive);
}
} // namespace

// ------------------------------------------------------------------ Statement

Statement::Statement(const Database* db, sqlite3_stmt* stmt)
    : m_db(db)
    , m_stmt(stmt)
{
}

Statement::Statement(Statement&& other) noexcept
    : m_db(other.m_db)
    , m_stmt(other.m_stmt)
    , m_error(std::move(other.m_error))
    , m_names(std::move(other.m_names))
{
    other.m_stmt = nullptr;
}

Statement& Statement::operator=(Statement&& other) noexcept
{
    if (this != &other) {
        sqlite3_finalize(m_stmt);
        m_db = other.m_db;
        m_stmt = other.m_stmt;
        m_error = std::move(other.m_error);
        m_names = std::move(other.m_names);
        other.m_stmt = nullptr;
    }
    return *this;
}

Statement::~Statement()
{
    sqlite3_finalize(m_stmt);
}

void Statement::fail(int rc)
{
    m_error = m_db ? m_db->lastError(rc) : DbError::other(QString::fromUtf8(sqlite3_errstr(rc)));
}

bool Statement::bind(int position, const QVariant& value)
{
    if (!m_stmt)
        return false;
    int rc = SQLITE_OK;
    if (!value.isValid() || value.isNull()) {
        rc = sqlite3_bind_null(m_stmt, position);
    } else {
        switch (value.metaType().id()) {
        case QMetaType::Bool:
            rc = sqlite3_bind_int(m_stmt, position, value.toBool() ? 1 : 0);
            break;
        case QMetaType::Int:
        case QMetaType::UInt:
        case QMetaType::Short:
        case QMetaType::UShort:
        case QMetaType::Char:
        case QMetaType::SChar:
        case QMetaType::UChar:
        case QMetaType::Long:
        case QMetaType::LongLong:
        case QMetaType::ULong:
        case QMetaType::ULongLong:
            rc = sqlite3_bind_int64(m_stmt, position, value.toLongLong());
            break;
        case QMetaType::Double:
        case QMetaType::Float:
            rc = sqlite3_bind_double(m_stmt, position, value.toDouble());
            break;
        case QMetaType::QByteArray: {
            const QByteArray b = value.toByteArray();
            rc = sqlite3_bind_blob64(m_stmt, position, b.constData(), sqlite3_uint64(b.size()), SQLITE_TRANSIENT);
            break;
        }
        case QMetaType::QDate:
            rc = sqlite3_bind_text(m_stmt, position, value.toDate().toString(Qt::ISODate).toUtf8().constData(), -1,
                                   SQLITE_TRANSIENT);
            break;
        case QMetaType::QDateTime: {
            const QByteArray t = value.toDateTime().toString(QStringLiteral("yyyy-MM-dd HH:mm:ss")).toUtf8();
            rc = sqlite3_bind_text(m_stmt, position, t.constData(), int(t.size()), SQLITE_TRANSIENT);
            break;
        }
        default: {
            const QByteArray t = value.toString().toUtf8();
            rc = sqlite3_bind_text64(m_stmt, position, t.constData(), sqlite3_uint64(t.size()), SQLITE_TRANSIENT,
                                     SQLITE_UTF8);
            break;
        }
        }
    }
    if (rc != SQLITE_OK) {
        fail(rc);
        return false;
    }
    return true;
}

void BindValue::setText(QStringView v)
{
    kind = Kind::Text;
    // At most three bytes for each UTF-16 unit; the buffer keeps its capacity.
    // Encoded here rather than by QString::toUtf8 only to reuse the buffer:
    // the bytes are the same, a lone surrogate included (it becomes "?").
    text.resize(v.size() * 3);
    auto* out = reinterpret_cast<unsigned char*>(text.data());
    const qsizetype n = v.size();
    for (qsizetype i = 0; i < n; ++i) {
        const char16_t u = v[i].unicode();
        if (u < 0x80) {
            *out++ = static_cast<unsigned char>(u);
        } else if (u < 0x800) {
            *out++ = static_cast<unsigned char>(0xC0 | (u >> 6));
            *out++ = static_cast<unsigned char>(0x80 | (u & 0x3F));
        } else if (QChar::isSurrogate(u)) {
            if (QChar::isHighSurrogate(u) && i + 1 < n && v[i + 1].isLowSurrogate()) {
                const char32_t c = QChar::surrogateToUcs4(u, v[++i].unicode());
                *out++ = static_cast<unsigned char>(0xF0 | (c >> 18));
                *out++ = static_cast<unsigned char>(0x80 | ((c >> 12) & 0x3F));
                *out++ = static_cast<unsigned char>(0x80 | ((c >> 6) & 0x3F));
                *out++ = static_cast<unsigned char>(0x80 | (c & 0x3F));
            } else {
                *out++ = '?';
            }
        } else {
            *out++ = static_cast<unsigned char>(0xE0 | (u >> 12));
            *out++ = static_cast<unsigned char>(0x80 | ((u >> 6) & 0x3F));
            *out++ = static_cast<unsigned char>(0x80 | (u & 0x3F));
        }
    }
    text.truncate(reinterpret_cast<char*>(out) - text.constData());
}

QVariant BindValue::toVariant() const
{
    switch (kind) {
    case Kind::Null:
        return QVariant();
    case Kind::Integer:
        return QVariant(qlonglong(integer));
    case Kind::Real:
        return QVariant(real);
    case Kind::Text:
        return QVariant(QString::fromUtf8(text));
    }
    return QVariant();
}

bool Statement::bind(int position, const BindValue& value)
{
    if (!m_stmt)
        return false;
    int rc = SQLITE_OK;
    switch (value.kind) {
    case BindValue::Kind::Null:
        rc = sqlite3_bind_null(m_stmt, position);
        break;
    case BindValue::Kind::Integer:
        rc = sqlite3_bind_int64(m_stmt, position, value.integer);
        break;
    case BindValue::Kind::Real:
        rc = sqlite3_bind_double(m_stmt, position, value.real);
        break;
    case BindValue::Kind::Text:
        rc = sqlite3_bind_text64(m_stmt, position, value.text.constData(), sqlite3_uint64(value.text.size()),
                                 SQLITE_STATIC, SQLITE_UTF8);
        break;
    }
    if (rc != SQLITE_OK) {
        fail(rc);
        return false;
    }
    return true;
}

bool Statement::bind(const QString& name, const QVariant& value)
{
    if (!m_stmt)
        return false;
    const int position = sqlite3_bind_parameter_index(m_stmt, name.toUtf8().constData());
    if (position == 0) {
        m_error = DbError::other(QStringLiteral("no parameter named %1").arg(name));
        return false;
    }
    return bind(position, value);
}

void Statement::clearBindings()
{
    if (m_stmt)
        sqlite3_clear_bindings(m_stmt);
}

Statement::Step Statement::step()
{
    if (!m_stmt)
        return Step::Error;
    const int rc = sqlite3_step(m_stmt);
    if (rc == SQLITE_ROW)
        return Step::Row;
    if (rc == SQLITE_DONE)
        return Step::Done;
    fail(rc);
    sqlite3_reset(m_stmt);
    return Step::Error;
}

DbError Statement::run()
{
    if (!m_stmt)
        return m_error.isError() ? m_error : DbError::other(QStringLiteral("statement not prepared"));
    m_error = {};
    Step s;
    while ((s = step()) == Step::Row) {
    }
    sqlite3_reset(m_stmt);
    return s == Step::Error ? m_error : DbError{};
}

void Statement::reset()
{
    if (m_stmt)
        sqlite3_reset(m_stmt);
    m_error = {};
}

int Statement::columnCount() const
{
    return m_stmt ? sqlite3_column_count(m_stmt) : 0;
}

QString Statement::columnName(int i) const
{
    return m_stmt ? QString::fromUtf8(sqlite3_column_name(m_stmt, i)) : QString();
}

int Statement::columnIndex(const QString& name) const
{
    if (m_names.isEmpty())
        for (int i = 0; i < columnCount(); ++i)
            m_names << columnName(i);
    for (int i = 0; i < m_names.size(); ++i)
        if (m_names[i].compare(name, Qt::CaseInsensitive) == 0)
            return i;
    return -1;
}

QVariant Statement::value(int i) const
{
    if (!m_stmt || i < 0 || i >= columnCount())
        return QVariant();
    switch (sqlite3_column_type(m_stmt, i)) {
    case SQLITE_INTEGER: return QVariant(qlonglong(sqlite3_column_int64(m_stmt, i)));
    case SQLITE_FLOAT: return QVariant(sqlite3_column_double(m_stmt, i));
    case SQLITE_TEXT: {
        const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(m_stmt, i));
        return QVariant(QString::fromUtf8(text, sqlite3_column_bytes(m_stmt, i)));
    }
    case SQLITE_BLOB: {
        const auto* data = static_cast<const char*>(sqlite3_column_blob(m_stmt, i));
        return QVariant(QByteArray(data, sqlite3_column_bytes(m_stmt, i)));
    }
    default: return QVariant();
    }
}

QString Statement::text(int i) const
{
    if (!m_stmt || i < 0 || i >= columnCount())
        return QString();
    switch (sqlite3_column_type(m_stmt, i)) {
    case SQLITE_TEXT: {
        // Text first, then its length: the engine's order for a valid length.
        const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(m_stmt, i));
        return QString::fromUtf8(text, sqlite3_column_bytes(m_stmt, i));
    }
    case SQLITE_INTEGER: return QString::number(qlonglong(sqlite3_column_int64(m_stmt, i)));
    case SQLITE_NULL: return QString();
    default: return value(i).toString();
    }
}

QVariant Statement::value(const QString& name) const
{
    return value(columnIndex(name));
}

bool Statement::isNull(int i) const
{
    return !m_stmt || sqlite3_column_type(m_stmt, i) == SQLITE_NULL;
}

QString Statement::sql() const
{
    return m_stmt ? QString::fromUtf8(sqlite3_sql(m_stmt)) : QString();
}

// ------------------------------------------------------------------- Database

bool HoldsStatementEnd(const QString& sqlPart)
{
    // The engine's own reading of literals, quoted names and comments: a text
    // that reads as complete up to a ';' ends a statement there. The opening
    // keeps a CREATE TRIGGER in the piece from hiding its ';'.
    const QByteArray text = "SELECT (" + sqlPart.toUtf8();
    for (qsizetype i = text.indexOf(';'); i >= 0; i = text.indexOf(';', i + 1))
        if (sqlite3_complete(text.left(i + 1).constData()))
            return true;
    return false;
}

void Database::setBusyTimeout(int ms)
{
    s_busyTimeoutMs = ms;
}

int Database::busyTimeout()
{
    return s_busyTimeoutMs;
}

void Database::setBusyWait(int ms)
{
    m_busyWaitMs = ms;
    if (m_db)
        sqlite3_busy_timeout(m_db, ms >= 0 ? ms : s_busyTimeoutMs);
}

Database::~Database()
{
    close();
}

DbError Database::lastError(int rc) const
{
    DbError e;
    e.kind = DbError::Kind::Other;
    e.code = m_db ? sqlite3_extended_errcode(m_db) : rc;
    if ((e.code & 0xff) != (rc & 0xff))
        e.code = rc;
    e.message = m_db ? QString::fromUtf8(sqlite3_errmsg(m_db)) : QString::fromUtf8(sqlite3_errstr(rc));
    if (e.code == SQLITE_CONSTRAINT_PRIMARYKEY || e.code == SQLITE_CONSTRAINT_UNIQUE)
        e.kind = DbError::Kind::DuplicateKey;
    // Another program (or window) holds the file for the whole wait: the user
    // can do nothing about the engine's words, only try again later.
    if ((e.code & 0xff) == SQLITE_BUSY)
        e.message = QStringLiteral("הקובץ '%1' תפוס כעת בידי תוכנה אחרת או חלון אחר, ולכן הפעולה לא בוצעה. נסו שוב בעוד רגע.")
                        .arg(QDir::toNativeSeparators(m_path));
    else if ((e.code & 0xff) == SQLITE_CANTOPEN)
        e.kind = DbError::Kind::NotFound;
    // A linked table that is not there because its file could not be linked:
    // the engine only knows the name is unknown; say what is wrong with the file.
    static const QLatin1String unknownTable("no such table: ");
    if (!m_linkProblems.empty() && e.message.startsWith(unknownTable)) {
        QString name = e.message.mid(unknownTable.size()).trimmed();
        name = name.mid(name.lastIndexOf(QLatin1Char('.')) + 1);
        const auto problem = m_linkProblems.find(name.toLower());
        if (problem != m_linkProblems.end()) {
            e.kind = problem->second.kind;
            e.message = problem->second.message;
        }
    }
    return e;
}

DbError Database::open(const QString& path, OpenMode mode)
{
    close();
    const QFileInfo info(path);
    if (mode == OpenMode::Create && info.exists())
        return DbError::other(QStringLiteral("הקובץ '%1' כבר קיים").arg(QDir::toNativeSeparators(path)));
    if (mode != OpenMode::Create && !info.exists())
        return DbError::notFound(
            QStringLiteral("בסיס הנתונים '%1' אינו נמצא").arg(QDir::toNativeSeparators(path)));

    int flags = SQLITE_OPEN_NOMUTEX;
    flags |= mode == OpenMode::ReadOnly ? SQLITE_OPEN_READONLY : SQLITE_OPEN_READWRITE;
    if (mode == OpenMode::Create)
        flags |= SQLITE_OPEN_CREATE;
    const int rc = sqlite3_open_v2(path.toUtf8().constData(), &m_db, flags, nullptr);
    if (rc != SQLITE_OK) {
        DbError e = lastError(rc);
        e.message += QStringLiteral(" (%1)").arg(QDir::toNativeSeparators(path));
        close();
        return e;
    }
    m_path = info.absoluteFilePath();
    sqlite3_extended_result_codes(m_db, 1);
    sqlite3_busy_timeout(m_db, m_busyWaitMs >= 0 ? m_busyWaitMs : s_busyTimeoutMs);

    // A file that is not a database, or one another program holds locked,
    // shows here rather than at the first query.
    DbError e;
    scalar(QStringLiteral("SELECT count(*) FROM main.sqlite_master"), &e);
    if (e) {
        if (!e.message.contains(QDir::toNativeSeparators(m_path)))
            e.message += QStringLiteral(" (%1)").arg(QDir::toNativeSeparators(path));
        close();
        return e;
    }
    openLinks();
    return {};
}

void Database::close()
{
    if (m_db) {
        sqlite3_close_v2(m_db);
        m_db = nullptr;
    }
    m_attached.clear();
    m_linkProblems.clear();
    m_path.clear();
}

DbError Database::exec(const QString& sql)
{
    if (!m_db)
        return DbError::other(QStringLiteral("database not open"));
    const int rc = sqlite3_exec(m_db, sql.toUtf8().constData(), nullptr, nullptr, nullptr);
    if (rc != SQLITE_OK)
        return lastError(rc);
    return {};
}

Statement Database::prepare(const QString& sql, DbError* error) const
{
    if (!m_db) {
        if (error)
            *error = DbError::other(QStringLiteral("database not open"));
        return {};
    }
    sqlite3_stmt* stmt = nullptr;
    const QByteArray text = sql.toUtf8();
    const char* tail = nullptr;
    const int rc = sqlite3_prepare_v2(m_db, text.constData(), int(text.size()), &stmt, &tail);
    DbError e;
    if (rc != SQLITE_OK)
        e = lastError(rc);
    else if (const QString rest = trailingStatement(tail, text.constData() + text.size()); !rest.isEmpty())
        e = DbError::other(QStringLiteral("השאילתה מכילה יותר מפקודה אחת, ומה שאחרי ה-';' לא יורץ: \"%1\"").arg(rest));
    if (e) {
        if (error)
            *error = e;
        sqlite3_finalize(stmt);
        Statement failed;
        failed.m_error = e;
        return failed;
    }
    if (error)
        *error = {};
    return Statement(this, stmt);
}

// The engine compiles the first statement of a text and stops at its ';'.
// Whatever statement follows would be dropped without a word (or a query cut
// short by a ';' inside it would run as a different query), so a prepared
// text must be one statement; only blanks, comments and empty statements may
// follow it. The engine's own parser tells: a literal holding ';' is no end.
QString Database::trailingStatement(const char* tail, const char* end) const
{
    while (tail && tail < end) {
        while (tail < end && (*tail == ' ' || *tail == '\t' || *tail == '\r' || *tail == '\n'))
            ++tail;
        if (tail >= end)
            break;
        sqlite3_stmt* next = nullptr;
        const char* after = nullptr;
        const int rc = sqlite3_prepare_v2(m_db, tail, int(end - tail), &next, &after);
        sqlite3_finalize(next);
        if (rc != SQLITE_OK || next || !after || after <= tail) {
            QString rest = QString::fromUtf8(tail, int(end - tail)).simplified();
            if (rest.size() > 60)
                rest = rest.left(60) + QStringLiteral("...");
            return rest;
        }
        tail = after;
    }
    return QString();
}

QVariant Database::scalar(const QString& sql, DbError* error) const
{
    DbError e;
    Statement s = prepare(sql, &e);
    QVariant v;
    if (!e) {
        const Statement::Step st = s.step();
        if (st == Statement::Step::Row)
            v = s.value(0);
        else if (st == Statement::Step::Error)
            e = s.error();
    }
    if (error)
        *error = e;
    return v;
}

DbError Database::begin()
{
    return exec(QStringLiteral("BEGIN"));
}

DbError Database::commit()
{
    return exec(QStringLiteral("COMMIT"));
}

DbError Database::rollback()
{
    return exec(QStringLiteral("ROLLBACK"));
}

bool Database::inTransaction() const
{
    return m_db && !sqlite3_get_autocommit(m_db);
}

long long Database::lastInsertId() const
{
    return m_db ? sqlite3_last_insert_rowid(m_db) : 0;
}

int Database::changes() const
{
    return m_db ? sqlite3_changes(m_db) : 0;
}

// -------------------------------------------------------- links and queries

DbError Database::ensureCatalog()
{
    return exec(QStringLiteral("CREATE TABLE IF NOT EXISTS main.%1 (Name TEXT NOT NULL COLLATE NOCASE, "
                               "Kind TEXT NOT NULL, Source TEXT, SqlText TEXT, Seq INTEGER NOT NULL, "
                               "CONSTRAINT PrimaryKey PRIMARY KEY (Name))")
                    .arg(kCatalogTable));
}

QString Database::aliasFor(const QString& sourcePath, DbError* error)
{
    for (const auto& [path, alias] : m_attached)
        if (path == sourcePath)
            return alias;
    const QString alias = QStringLiteral("link%1").arg(m_attached.size() + 1);
    Statement s = prepare(QStringLiteral("ATTACH DATABASE ?1 AS %1").arg(alias));
    s.bind(1, sourcePath);
    if (DbError e = s.run()) {
        if (error)
            *error = e;
        return QString();
    }
    m_attached.emplace_back(sourcePath, alias);
    return alias;
}

DbError Database::linkProblem(LinkFault fault, const QString& table, const QString& path, const QString& recorded,
                              const DbError& cause)
{
    const QString file = QDir::toNativeSeparators(path);
    switch (fault) {
    case LinkFault::Missing: {
        QString text = QStringLiteral("הטבלה '%1' מקושרת לקובץ '%2', והקובץ אינו נמצא.").arg(table, file);
        if (QFileInfo(recorded).absoluteFilePath() != QFileInfo(path).absoluteFilePath())
            text += QStringLiteral(" גם בנתיב שנרשם בקישור, '%1', אין קובץ כזה.").arg(QDir::toNativeSeparators(recorded));
        return DbError::notFound(text);
    }
    case LinkFault::NoTable:
        return DbError::notFound(
            QStringLiteral("בקובץ '%1', שהטבלה '%2' מקושרת אליו, אין טבלה בשם זה.").arg(file, table));
    case LinkFault::Unreadable: break;
    }
    switch (cause.code & 0xff) {
    case SQLITE_NOTADB:
    case SQLITE_CORRUPT:
        return DbError::other(
            QStringLiteral("הקובץ '%1', שהטבלה '%2' מקושרת אליו, אינו קובץ בסיס נתונים או שהוא פגום.").arg(file, table));
    case SQLITE_BUSY:
    case SQLITE_LOCKED:
        return DbError::other(
            QStringLiteral("הקובץ '%1', שהטבלה '%2' מקושרת אליו, תפוס בידי תוכנה אחרת.").arg(file, table));
    default:
        return DbError::other(QStringLiteral("לא ניתן לפתוח את הקובץ '%1', שהטבלה '%2' מקושרת אליו: %3")
                                  .arg(file, table, cause.message));
    }
}

void Database::openLinks()
{
    DbError e;
    const bool hasCatalog
        = scalar(QStringLiteral("SELECT count(*) FROM main.sqlite_master WHERE type='table' AND name='%1'")
                     .arg(kCatalogTable),
                 &e)
              .toInt()
        > 0;
    if (!hasCatalog)
        return;
    std::map<QString, DbError> failedFiles;
    for (const auto& [table, source] : links()) {
        // The file of the same name beside this one comes first: a data folder
        // that was copied must read its own files, not the folder it was copied
        // from. The recorded path serves only when nothing is beside it.
        const QString sibling = QFileInfo(m_path).dir().filePath(QFileInfo(source).fileName());
        const QString path = QFileInfo::exists(sibling) ? sibling : source;
        // A link that cannot be made is remembered, not fatal: the file still
        // opens, and only a statement that uses the table fails, saying why.
        const QString key = table.toLower();
        if (!QFileInfo::exists(path)) {
            m_linkProblems[key] = linkProblem(LinkFault::Missing, table, sibling, source);
            continue;
        }
        // A file that failed once is not tried again for its other tables:
        // a locked one would make each of them wait.
        const auto failed = failedFiles.find(path);
        if (failed != failedFiles.end()) {
            m_linkProblems[key] = linkProblem(LinkFault::Unreadable, table, path, source, failed->second);
            continue;
        }
        DbError attachError;
        const QString alias = aliasFor(path, &attachError);
        if (alias.isEmpty()) {
            failedFiles[path] = attachError;
            m_linkProblems[key] = linkProblem(LinkFault::Unreadable, table, path, source, attachError);
            continue;
        }
        Statement check = prepare(
            QStringLiteral("SELECT count(*) FROM %1.sqlite_master WHERE type='table' AND name=?1 COLLATE NOCASE")
                .arg(alias));
        check.bind(1, table);
        if (check.step() != Statement::Step::Row)
            m_linkProblems[key] = linkProblem(LinkFault::Unreadable, table, path, source, check.error());
        else if (check.value(0).toInt() == 0)
            m_linkProblems[key] = linkProblem(LinkFault::NoTable, table, path, source);
    }
    Statement q = prepare(
        QStringLiteral("SELECT Name, SqlText FROM main.%1 WHERE Kind='select' ORDER BY Seq").arg(kCatalogTable));
    while (q.step() == Statement::Step::Row)
        createQueryView(q.value(0).toString(), q.value(1).toString());
}

void Database::createQueryView(const QString& name, const QString& sql)
{
    exec(QStringLiteral("DROP VIEW IF EXISTS temp.%1").arg(quotedName(name)));
    exec(QStringLiteral("CREATE TEMP VIEW %1 AS %2").arg(quotedName(name), sql));
}

DbError Database::attachTable(const QString& sourcePath, const QString& table)
{
    if (DbError e = ensureCatalog())
        return e;
    const QString path = QFileInfo(sourcePath).absoluteFilePath();
    if (!QFileInfo::exists(path))
        return DbError::notFound(objectNotFound(table, sourcePath));
    const QString alias = aliasFor(path, nullptr);
    if (alias.isEmpty())
        return DbError::notFound(objectNotFound(table, sourcePath));
    Statement check = prepare(
        QStringLiteral("SELECT count(*) FROM %1.sqlite_master WHERE type='table' AND name=?1 COLLATE NOCASE").arg(alias));
    check.bind(1, table);
    if (check.step() != Statement::Step::Row || check.value(0).toInt() == 0)
        return DbError::notFound(objectNotFound(table, sourcePath));
    Statement own = prepare(
        QStringLiteral("SELECT count(*) FROM main.sqlite_master WHERE name=?1 COLLATE NOCASE"));
    own.bind(1, table);
    if (own.step() == Statement::Step::Row && own.value(0).toInt() > 0)
        return DbError::other(QStringLiteral("האובייקט '%1' כבר קיים").arg(table));

    Statement add = prepare(QStringLiteral("INSERT INTO main.%1 (Name, Kind, Source, Seq) "
                                           "VALUES (?1, 'link', ?2, (SELECT coalesce(max(Seq), 0) + 1 FROM main.%1))")
                                .arg(kCatalogTable));
    add.bind(1, table);
    add.bind(2, path);
    return add.run();
}

DbError Database::createQuery(const QString& name, const QString& sql)
{
    if (DbError e = ensureCatalog())
        return e;
    const bool select = isSelect(sql);
    if (select) {
        // Check the text now, so a stored query that cannot run is not kept.
        exec(QStringLiteral("DROP VIEW IF EXISTS temp.%1").arg(quotedName(name)));
        if (DbError e = exec(QStringLiteral("CREATE TEMP VIEW %1 AS %2").arg(quotedName(name), sql)))
            return e;
    }
    Statement add = prepare(QStringLiteral("INSERT INTO main.%1 (Name, Kind, SqlText, Seq) "
                                           "VALUES (?1, ?2, ?3, (SELECT coalesce(max(Seq), 0) + 1 FROM main.%1))")
                                .arg(kCatalogTable));
    add.bind(1, name);
    add.bind(2, select ? QStringLiteral("select") : QStringLiteral("action"));
    add.bind(3, sql);
    return add.run();
}

QString Database::querySql(const QString& name) const
{
    Statement s = prepare(
        QStringLiteral("SELECT SqlText FROM main.%1 WHERE Name=?1 AND Kind IN ('select','action')").arg(kCatalogTable));
    s.bind(1, name);
    return s.step() == Statement::Step::Row ? s.value(0).toString() : QString();
}

QStringList Database::queryNames() const
{
    QStringList names;
    Statement s = prepare(
        QStringLiteral("SELECT Name FROM main.%1 WHERE Kind IN ('select','action') ORDER BY Seq").arg(kCatalogTable));
    while (s.step() == Statement::Step::Row)
        names << s.value(0).toString();
    return names;
}

DbError Database::runQuery(const QString& name, int* changed)
{
    const QString sql = querySql(name);
    if (sql.isEmpty())
        return DbError::notFound(objectNotFound(name, m_path));
    DbError e = exec(sql);
    if (changed)
        *changed = e ? 0 : changes();
    return e;
}

std::vector<std::pair<QString, QString>> Database::links() const
{
    std::vector<std::pair<QString, QString>> out;
    Statement s = prepare(
        QStringLiteral("SELECT Name, Source FROM main.%1 WHERE Kind='link' ORDER BY Seq").arg(kCatalogTable));
    while (s.step() == Statement::Step::Row)
        out.emplace_back(s.value(0).toString(), s.value(1).toString());
    return out;
}

bool Database::hasTable(const QString& table) const
{
    DbError e;
    prepare(QStringLiteral("SELECT * FROM %1 LIMIT 0").arg(quotedName(table)), &e);
    return !e;
}

QStringList Database::tableNames() const
{
    QStringList names;
    Statement s = prepare(QStringLiteral("SELECT name FROM main.sqlite_master WHERE type='table' AND name NOT "
                                               "LIKE 'sqlite%' AND name <> '%1' ORDER BY rowid")
                                    .arg(kCatalogTable));
    while (s.step() == Statement::Step::Row)
        names << s.value(0).toString();
    return names;
}

// ---------------------------------------------------------------- Transaction

Transaction::Transaction(Database& db)
    : m_db(db)
{
    m_error = m_db.begin();
    m_active = !m_error;
}

Transaction::~Transaction()
{
    if (m_active)
        m_db.rollback();
}

DbError Transaction::commit()
{
    if (!m_active)
        return m_error.isError() ? m_error : DbError::other(QStringLiteral("no transaction"));
    m_active = false;
    m_error = m_db.commit();
    if (m_error)
        m_db.rollback();
    return m_error;
}

} // namespace tagora
