#pragma once

#include <QString>
#include <QStringList>
#include <QVariant>
#include <map>
#include <memory>
#include <vector>

struct sqlite3;
struct sqlite3_stmt;

namespace tagora {

// An error of the local database engine: its message, its code, and whether
// it was a duplicate key (a row with the same primary or unique key exists),
// which importers skip and go on.
struct DbError {
    enum class Kind { None, DuplicateKey, NotFound, Other };
    Kind kind = Kind::None;
    int code = 0; // the engine's extended result code, 0 for errors of this layer
    QString message;

    bool isError() const { return kind != Kind::None; }
    bool isDuplicateKey() const { return kind == Kind::DuplicateKey; }
    explicit operator bool() const { return isError(); }

    static DbError other(const QString& message) { return {Kind::Other, 0, message}; }
    static DbError notFound(const QString& message) { return {Kind::NotFound, 0, message}; }
};

class Database;

// A value already in the form the engine stores, so the thread that binds it
// only hands it over: text is UTF-8 bytes, numbers are numbers. The text's
// buffer is kept between rows, so filling it again allocates nothing.
struct BindValue {
    enum class Kind : unsigned char { Null, Integer, Real, Text };
    Kind kind = Kind::Null;
    qint64 integer = 0;
    double real = 0;
    QByteArray text;

    void setNull() { kind = Kind::Null; }
    void setInteger(qint64 v)
    {
        kind = Kind::Integer;
        integer = v;
    }
    void setReal(double v)
    {
        kind = Kind::Real;
        real = v;
    }
    void setText(QStringView v);
    // Null for an empty text: the ERP's empty fields are stored as nothing.
    void setTextOrNull(QStringView v)
    {
        if (v.isEmpty())
            setNull();
        else
            setText(v);
    }
    // The value as the QVariant binding would have stored it.
    QVariant toVariant() const;
};

// A prepared statement. Columns are found by name without regard to case;
// NULL reads as a null QVariant. Bound values: null, bool (as 1/0), whole
// numbers, doubles, text, bytes; dates as ISO text.
class Statement {
public:
    enum class Step { Row, Done, Error };

    Statement() = default;
    Statement(Statement&& other) noexcept;
    Statement& operator=(Statement&& other) noexcept;
    Statement(const Statement&) = delete;
    Statement& operator=(const Statement&) = delete;
    ~Statement();

    bool isValid() const { return m_stmt != nullptr; }

    // Positions are 1-based, as in SQL text (?1, ?2 ...); names include their
    // prefix (":key").
    bool bind(int position, const QVariant& value);
    bool bind(const QString& name, const QVariant& value);
    // The text is not copied: it must stay as it is until the statement has
    // run, and be bound again before the next run.
    bool bind(int position, const BindValue& value);
    void clearBindings();

    Step step();
    // Runs a statement that returns no rows to its end.
    DbError run();
    void reset();

    int columnCount() const;
    QString columnName(int i) const;
    // -1 when there is no such column.
    int columnIndex(const QString& name) const;
    QVariant value(int i) const;
    QVariant value(const QString& name) const;
    // The value as text, the same as value(i).toString(), with no QVariant
    // made for text, whole numbers or NULL (empty text).
    QString text(int i) const;
    bool isNull(int i) const;

    const DbError& error() const { return m_error; }
    QString sql() const;

private:
    friend class Database;
    Statement(const Database* db, sqlite3_stmt* stmt);
    void fail(int rc);

    const Database* m_db = nullptr;
    sqlite3_stmt* m_stmt = nullptr;
    DbError m_error;
    mutable QStringList m_names;
};

// One local database file, opened with its links: every table linked into the
// file is reachable under its own name, and every stored query is there as a
// view under its name. A link reads the file of its source's name beside this
// file when there is one, else the path it recorded. A link whose file is
// missing, damaged or lacks the table does not stop the open; a statement that
// uses the table fails with an error naming the file and what is wrong with it.
// Closing (or destroying) releases the file.
class Database {
public:
    enum class OpenMode { ReadWrite, ReadOnly, Create };

    Database() = default;
    ~Database();
    Database(const Database&) = delete;
    Database& operator=(const Database&) = delete;

    // Opens an existing file (ReadWrite, ReadOnly) or makes a new empty one
    // (Create; the file must not exist). Fails on a missing, locked or
    // unreadable file with the engine's message.
    DbError open(const QString& path, OpenMode mode = OpenMode::ReadWrite);
    void close();
    bool isOpen() const { return m_db != nullptr; }
    QString path() const { return m_path; }

    // Runs one or more statements that return no rows.
    DbError exec(const QString& sql);
    // One statement: a text that goes on with another after its ';' is
    // refused, not cut (a ';' inside a literal is text, not an end).
    Statement prepare(const QString& sql, DbError* error = nullptr) const;
    // The first column of the first row, or a null value.
    QVariant scalar(const QString& sql, DbError* error = nullptr) const;

    DbError begin();
    DbError commit();
    DbError rollback();
    bool inTransaction() const;

    long long lastInsertId() const;
    int changes() const;

    // Links and stored queries kept in the file.
    // Links sourceTable of the file at sourcePath under the same name. The
    // source is checked now: a missing file or table fails the link.
    DbError attachTable(const QString& sourcePath, const QString& table);
    // A stored query. A SELECT is reachable as a view under its name from the
    // next open on (and at once); any other statement runs by runQuery.
    DbError createQuery(const QString& name, const QString& sql);
    DbError runQuery(const QString& name, int* changed = nullptr);
    QString querySql(const QString& name) const;
    QStringList queryNames() const;
    // Linked table name -> source file path, in creation order.
    std::vector<std::pair<QString, QString>> links() const;

    // Whether the file (or an attached one, for an unqualified name) has the table.
    bool hasTable(const QString& table) const;
    QStringList tableNames() const;

    // How long to wait for a file another program holds, in milliseconds,
    // for databases opened from now on.
    static void setBusyTimeout(int ms);
    static int busyTimeout();
    // This connection's own wait, for work a user waits on with the screen
    // still (a click in a grid); negative gives back the shared one. Applies
    // at once and to the next open.
    void setBusyWait(int ms);

    sqlite3* handle() const { return m_db; }
    DbError lastError(int rc) const;

private:
    enum class LinkFault { Missing, NoTable, Unreadable };

    QString trailingStatement(const char* tail, const char* end) const;
    DbError ensureCatalog();
    void openLinks();
    void createQueryView(const QString& name, const QString& sql);
    QString aliasFor(const QString& sourcePath, DbError* error);
    static DbError linkProblem(LinkFault fault, const QString& table, const QString& path, const QString& recorded,
                               const DbError& cause = {});

    sqlite3* m_db = nullptr;
    int m_busyWaitMs = -1;
    QString m_path;
    std::vector<std::pair<QString, QString>> m_attached; // source path -> alias
    std::map<QString, DbError> m_linkProblems;            // lower-case linked table -> why it is not there
};

// Begins a transaction and rolls it back unless committed.
class Transaction {
public:
    explicit Transaction(Database& db);
    ~Transaction();
    DbError commit();
    const DbError& error() const { return m_error; }

private:
    Database& m_db;
    bool m_active = false;
    DbError m_error;
};

// Whether a piece of SQL meant to sit inside a statement (an expression the
// user typed) holds a ';' that would end that statement: one outside string
// literals, quoted names and comments ('a;b' is text).
bool HoldsStatementEnd(const QString& sqlPart);

// Name of the table in every file that records its links and stored queries.
inline const QString kCatalogTable = QStringLiteral("tgrObjects");

} // namespace tagora
