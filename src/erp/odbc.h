#pragma once

#include <QDeadlineTimer>
#include <QElapsedTimer>
#include <QString>
#include <QStringList>
#include <QVariant>
#include <memory>
#include <vector>

namespace tagora {

// Read-only access to the ERP's database through ODBC. The system never
// writes there: the server is told to refuse writes on connecting (SQLite:
// query_only; PostgreSQL: a read-only session), and one statement that only
// reads is all that is sent. Nothing here shows anything; every failure comes
// back as the driver's own message, or a Hebrew one for what is refused here.
class ErpRecordset;

// The values a query's "?" markers stand for, in order: text (sent as wide
// characters, so Hebrew arrives as written), whole numbers, decimals, dates.
// A value sent this way never becomes part of the SQL text, so no server's
// quoting rules (a backslash that escapes, say) can make it end a literal.
using ErpParams = QVariantList;

// A query as the readers send it: its text, with "?" for each value.
struct ErpQuery {
    QString sql;
    ErpParams params;
};

class ErpConnection {
public:
    ErpConnection();
    ~ErpConnection();
    ErpConnection(const ErpConnection&) = delete;
    ErpConnection& operator=(const ErpConnection&) = delete;

    // Connects with the connection text as it stands ("DSN=...;Uid=...;pwd=..."
    // or any ODBC connection text). The time-out is the whole operation's:
    // the login and every statement after it share it, a locked SQLite file
    // included, so an unreachable or locked server ends in the driver's
    // message, not a hang. For the SQLite driver, which reads no braces, a
    // value it cannot take safely is refused, and a missing file is reported
    // rather than created.
    bool open(const QString& connectionText, int timeoutSeconds, QString* error);
    // Starts the time-out's budget again, for a connection that serves many
    // small operations one after another (the lines of each document): each
    // gets the whole time-out, and a long run of them does not starve the last.
    void restartTimeout();
    void close();
    bool isOpen() const;

    // The server's own name for itself ("SQLite", "PostgreSQL", ...).
    QString dbmsName() const { return m_dbms; }
    bool isSqlite() const;
    // The connection's default database (for a file-based driver, its path).
    QString currentCatalog() const;

    // Opens a forward-only, read-only recordset for one statement that only
    // reads (a closing ";" allowed), its "?" markers standing for params.
    // Null when the query was refused or failed (the message in error).
    std::unique_ptr<ErpRecordset> query(const QString& sql, const ErpParams& params, QString* error);
    std::unique_ptr<ErpRecordset> query(const QString& sql, QString* error) { return query(sql, {}, error); }
    std::unique_ptr<ErpRecordset> query(const ErpQuery& q, QString* error) { return query(q.sql, q.params, error); }

    // The number of rows a query returns, by a count over it, or -1 when the
    // server cannot count it (progress then shows nothing).
    long long countRows(const QString& sql, const ErpParams& params, QString* error = nullptr);
    long long countRows(const QString& sql, QString* error = nullptr) { return countRows(sql, {}, error); }

    // The text actually sent for a query: SQLite, standing in for the ERP's
    // server, lacks two literal forms the readers use (N'text' and
    // #dd/mm/yyyy#), so for SQLite alone they are rewritten. A date literal
    // becomes 'yyyy-mm-dd', and a column compared with it is compared by its
    // day (date(column)), since SQLite would compare a stored time as text.
    // A "?" whose value is a date is a day in the same way: the column beside
    // it is taken to its day, and the value goes out as 'yyyy-mm-dd' text.
    QString dialectSql(const QString& sql, const ErpParams& params = {}) const;
    static QString rewriteForSqlite(const QString& sql, const ErpParams& params = {});
    // The statement with its "?" values written in as SQLite literals, or
    // empty when they cannot all be written safely (they are bound then).
    // SQLite's driver holds a whole result in memory when a statement has
    // parameters, and steps through it when it has none.
    static QString inlineSqliteValues(const QString& sql, const ErpParams& params);

private:
    friend class ErpRecordset;
    struct Handles;
    // Seconds left of the operation's time-out (0: none was set).
    int remainingSeconds() const;
    void* newStatement(QString* error);
    // Runs a statement of our own, past the guard, and drops any result.
    bool execute(const QString& sql, QString* error);

    std::unique_ptr<Handles> m_h;
    QString m_dbms;
    int m_timeout = 0;
    QDeadlineTimer m_deadline;
    // The SQLite lock wait last set, and when: it is set again only when it
    // could run a second past the budget, not before every statement.
    qint64 m_busyWaitSet = -1;
    QElapsedTimer m_busyWaitSince;
};

class ErpRecordset {
public:
    ~ErpRecordset();
    // Moves to the next row; false at the end or on an error (see error()).
    bool next();
    bool failed() const { return !m_error.isEmpty(); }
    QString error() const { return m_error; }

    int columnCount() const { return int(m_columns.size()); }
    QString columnName(int i) const { return m_columns[size_t(i)].name; }
    // By name or alias, without regard to case; -1 when absent.
    int columnIndex(const QString& name) const;
    // The current row's value: null for SQL NULL; whole numbers as qlonglong,
    // decimals as double, text as QString, dates as QDate or QDateTime.
    QVariant value(int i) const { return m_row[size_t(i)]; }
    QVariant value(const QString& name) const;
    bool has(const QString& name) const { return columnIndex(name) >= 0; }

private:
    friend class ErpConnection;
    struct Column {
        QString name;
        short sqlType;
    };
    ErpRecordset(void* stmt);
    bool describe();
    QVariant fetchValue(int i);

    void* m_stmt;
    std::vector<Column> m_columns;
    std::vector<QVariant> m_row;
    QString m_error;
};

// Quotes a value for an ODBC connection text when it needs it: a value with
// ";", "{" or "}", or with blanks at either end, goes between braces with
// every "}" doubled. Any other value is returned unchanged.
QString odbcConnValue(const QString& value);

} // namespace tagora
