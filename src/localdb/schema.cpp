#include "localdb/schema.h"

#include "platform/platformdefaults.h"

#include <QCoreApplication>
#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QRegularExpression>
#include <QSysInfo>

#include <algorithm>
#include <filesystem>
#include <functional>
#include <optional>
#include <system_error>

#ifdef Q_OS_UNIX
#include <cerrno>
#include <csignal>
#include <unistd.h>
#elif defined(Q_OS_WIN)
#include <windows.h>
#endif

namespace tagora {

namespace {
using T = FieldType;

std::vector<FieldDef> itemFields(bool staging)
{
    // The staging copy is narrower in a few places and counts copies in a byte.
    return {
        {"ItemKey", T::Text, 25},
        {"ItemName", T::Text, 100},
        {"VNItemName", T::Text, staging ? 200 : 250},
        {"ItemSort", T::Text, staging ? 10 : 20},
        {"Filter", T::Text, staging ? 7 : 20},
        {"Unit", T::Text, staging ? 5 : 10},
        {"PurchaseUnit", T::Text, 5},
        {"Fname", T::Text, staging ? 100 : 200},
        {"Local", T::Text, 20},
        {"BarCode", T::Text, 25},
        {"Coin", T::Text, 5},
        {"Price", T::Double},
        {"Weight", T::Double},
        {"Volume", T::Double},
        {"LastUpdate", T::DateTime},
        {"Version", T::Text, 50},
        {"Copies", staging ? T::Byte : T::Integer},
        {"PrintLabel", T::Boolean},
        {"SuppCatNum", T::Text, 25},
        {"SalPackUN", T::Double},
        {"PurPackUN", T::Double},
        {"IgnoreInDoc", T::Boolean},
    };
}

TableDef alterKeys(const char* name)
{
    return {name,
            {{"AccountKey", T::Text, 20}, {"ItemKey", T::Text, 25}, {"AlterNum", T::Text, 30}, {"AlterBar", T::Text, 30}},
            {"AccountKey", "ItemKey"}};
}

TableDef alterPrices(const char* name)
{
    return {name,
            {{"AccountKey", T::Text, 20}, {"ItemKey", T::Text, 25}, {"Price", T::Double}, {"Coin", T::Text, 5}},
            {"AccountKey", "ItemKey"}};
}

TableDef priceList(const char* name)
{
    return {name,
            {{"ItemKey", T::Text, 25}, {"PriceList", T::Long}, {"Price", T::Double}, {"Currency", T::Text, 3}},
            {"ItemKey", "PriceList"}};
}

QString quoteName(const char* name)
{
    return QLatin1Char('"') + QLatin1String(name) + QLatin1Char('"');
}

// The stored queries, in SQLite's words: booleans compare with TRUE, Jet's
// string "+" is "||", Format$ of a date is strftime, and the update-over-a-
// left-join merges are upserts that insert what is missing and update what
// matches, never deleting.
const std::vector<std::pair<const char*, const char*>>& tempDocsQueries()
{
    static const std::vector<std::pair<const char*, const char*>> q = {
        {"qSelectDocHeaders",
         "SELECT (tDocTypes.DocDesc || '') AS MyDocDesc , tTempDocHeaders.Reference1"
         ", strftime('%d/%m/', tTempDocHeaders.DocDate) || substr(strftime('%Y', tTempDocHeaders.DocDate), 3, 2)"
         " AS DocDateText"
         ", tTempDocHeaders.AccountKey, tTempDocHeaders.Include"
         ", tTempDocHeaders.CardName"
         ", tTempDocHeaders.WizFileID, tTempDocHeaders.Number"
         " FROM (tTempDocHeaders Inner Join tDocTypes"
         " On tDocTypes.DocType = tTempDocHeaders.DocType)"
         " ORDER BY tTempDocHeaders.DocType, tTempDocHeaders.Reference1"
         ", tTempDocHeaders.DocDate"},
        {"qSelectDocLines",
         "SELECT tTempDocLines.LineNum, tTempDocLines.ItemKey, tItems.ItemName"
         ", tTempDocLines.Quantity, tTempDocLines.Warehouse, tTempDocLines.Copies"
         ", tTempDocLines.Include"
         " FROM (tTempDocLines Inner Join tItems"
         " On tItems.ItemKey = tTempDocLines.ItemKey)"
         " ORDER BY tTempDocLines.HeadNumber, tTempDocLines.LineNum"},
        {"qDocTypes",
         "SELECT tDocTypes.DocType, tDocTypes.DocDesc, tDocTypes.WizFileID"
         ", tDocTypes.vTYPE, tDocTypes.Include, tDocTypes.IncludeDraft"
         ", tDocTypes.CSTableID"
         ", tWizFiles.HeadTable, tWizFiles.LineTable, tWizFiles.fldID"
         ", tWizFiles.fldRef1, tWizFiles.fldDate, tWizFiles.fldLineID"
         ", tCSTable.CSTableName, tCSTable.fldCSID, tCSTable.fldCSKey"
         ", tCSTable.fldCSDesc, tWizFiles.fldDocCSID, tWizFiles.NoDraft"
         ", tCSTable.fldMerakezID, tWizFiles.fldRef2"
         " FROM (tDocTypes INNER JOIN tCSTable ON tDocTypes.CSTableID = tCSTable.CSTableID)"
         " INNER JOIN tWizFiles ON tDocTypes.WizFileID = tWizFiles.WizFileID"},
    };
    return q;
}

const std::vector<std::pair<const char*, const char*>>& itemsQueries()
{
    static const std::vector<std::pair<const char*, const char*>> q = {
        // Marked items first: true is 1 here, so the mark sorts descending.
        {"qSelectItems", "SELECT ItemKey, ItemName, Copies, PrintLabel FROM tItems ORDER BY tItems.PrintLabel DESC, tItems.Itemkey"},
        {"qSelectMarkedItems", "SELECT ItemKey, ItemName, Copies, PrintLabel FROM tItems Where PrintLabel = True"
                               " ORDER BY tItems.PrintLabel DESC, tItems.Itemkey"},
        {"qEditItems", "SELECT ItemKey, ItemName, Unit, BarCode, Price FROM tItems ORDER BY tItems.Itemkey"},
    };
    return q;
}

const std::vector<std::pair<const char*, const char*>>& tempItemsQueries()
{
    // "WHERE ... IS NOT NULL" keeps SQLite from reading ON CONFLICT as a join clause.
    static const std::vector<std::pair<const char*, const char*>> q = {
        {"qAddUpdateAlterKeys",
         "INSERT INTO tAlterKeys (AccountKey, ItemKey, AlterNum)"
         " SELECT AccountKey, ItemKey, AlterNum FROM tTempAlterKeys"
         " WHERE tTempAlterKeys.AccountKey IS NOT NULL"
         " ON CONFLICT (AccountKey, ItemKey) DO UPDATE SET AlterNum = excluded.AlterNum"},
        {"qAddUpdateAlterPrices",
         "INSERT INTO tAlterPrices (AccountKey, ItemKey, Price, Coin)"
         " SELECT AccountKey, ItemKey, Price, Coin FROM tTempAlterPrices"
         " WHERE tTempAlterPrices.AccountKey IS NOT NULL"
         " ON CONFLICT (AccountKey, ItemKey) DO UPDATE SET Price = excluded.Price, Coin = excluded.Coin"},
        {"qAddUpdatePriceList",
         "INSERT INTO tPriceList (ItemKey, PriceList, Price, Currency)"
         " SELECT ItemKey, PriceList, Price, Currency FROM tTempPriceList"
         " WHERE tTempPriceList.PriceList <> 0"
         " ON CONFLICT (ItemKey, PriceList) DO UPDATE SET Price = excluded.Price, Currency = excluded.Currency"},
    };
    return q;
}

bool removeDatabaseFile(const QString& path, DbError* error)
{
    for (const QString& suffix : {QStringLiteral("-journal"), QStringLiteral("-wal"), QStringLiteral("-shm")})
        QFile::remove(path + suffix);
    if (QFileInfo::exists(path) && !QFile::remove(path)) {
        if (error)
            *error = DbError::other(QStringLiteral("לא ניתן למחוק את הקובץ '%1'").arg(QDir::toNativeSeparators(path)));
        return false;
    }
    return true;
}

// ---- Files built aside.
//
// A file is built under a name of its own beside the target and takes the
// target's name only when whole, so a run killed half way leaves the target
// as it was (or missing), never a file that looks usable and lacks tables.
// The name says which file, on which machine and in which process, so the
// next run can tell a leftover of a dead process from a build another
// instance has under way: "tgrrtdb.tmp.building-host-1234".

const QString kBuilding = QStringLiteral(".building-");

QString thisHost()
{
    QString host = QSysInfo::machineHostName();
    for (QChar& c : host)
        if (!(c.isLetterOrNumber() && c.unicode() < 128))
            c = QLatin1Char('_');
    return host.isEmpty() ? QStringLiteral("_") : host;
}

} // namespace

QString BuildingPath(const QString& target)
{
    return target + kBuilding + thisHost() + QLatin1Char('-') + QString::number(QCoreApplication::applicationPid());
}

namespace {

bool processRunning(qint64 pid)
{
#ifdef Q_OS_UNIX
    return ::kill(pid_t(pid), 0) == 0 || errno == EPERM;
#elif defined(Q_OS_WIN)
    HANDLE process = OpenProcess(PROCESS_QUERY_LIMITED_INFORMATION, FALSE, DWORD(pid));
    if (!process)
        return GetLastError() == ERROR_ACCESS_DENIED;
    DWORD code = 0;
    const bool running = GetExitCodeProcess(process, &code) && code == STILL_ACTIVE;
    CloseHandle(process);
    return running;
#else
    Q_UNUSED(pid);
    return true;
#endif
}

// Puts a whole file in place of the target, replacing what is there. The
// target's own journal goes first: left from a crash, it would be played
// back into the new file.
DbError moveIntoPlace(const QString& building, const QString& target)
{
    for (const QString& suffix : {QStringLiteral("-journal"), QStringLiteral("-wal"), QStringLiteral("-shm")})
        QFile::remove(target + suffix);
    // Unlike QFile::rename, this replaces the target in one step.
#ifdef Q_OS_WIN
    const std::filesystem::path from(building.toStdWString()), to(target.toStdWString());
#else
    const std::filesystem::path from(QFile::encodeName(building).toStdString()), to(QFile::encodeName(target).toStdString());
#endif
    std::error_code ec;
    std::filesystem::rename(from, to, ec);
    if (ec)
        return DbError::other(QStringLiteral("לא ניתן להעביר את בסיס הנתונים אל '%1': %2")
                                  .arg(QDir::toNativeSeparators(target), QString::fromLocal8Bit(ec.message().c_str())));
    return {};
}

// Runs the creation steps in order on a file aside and moves it into place
// when whole; finish, when given, adds what the caller's file needs before
// that. On an error the file aside is removed and the target stays as it was.
QString createDatabase(const QString& path, const std::vector<TableDef>& tables,
                       const std::vector<std::pair<QString, QString>>& links,
                       const std::vector<std::pair<const char*, const char*>>& queries, DbError* error,
                       const std::function<DbError(Database&)>& finish = {})
{
    DbError local;
    DbError& e = error ? *error : local;
    e = {};
    const QString building = BuildingPath(path);
    if (!removeDatabaseFile(building, &e))
        return QString();
    {
        Database db;
        auto made = [&]() -> DbError {
            if (DbError f = db.open(building, Database::OpenMode::Create))
                return f;
            for (const TableDef& t : tables)
                if (DbError f = db.exec(createTableSql(t)))
                    return f;
            for (const auto& [source, table] : links)
                if (DbError f = AttachTable(db, source, table))
                    return f;
            for (const auto& [name, sql] : queries)
                if (DbError f = db.createQuery(QLatin1String(name), QString::fromUtf8(sql)))
                    return f;
            if (finish)
                return finish(db);
            return {};
        };
        e = made();
    }
    if (!e)
        e = moveIntoPlace(building, path);
    if (e) {
        removeDatabaseFile(building, nullptr);
        return QString();
    }
    return path;
}

DbError addUpgradeColumns(Database& db)
{
    for (const char* column : {"FldID SMALLINT", "FldMaxLen SMALLINT", "Label2Name TEXT(50)"})
        if (DbError e = db.exec(QStringLiteral("ALTER TABLE tAccountDef ADD COLUMN %1").arg(QLatin1String(column))))
            return e;
    return {};
}

// What one of the files the system makes must hold to be used: its own
// tables, and in its catalog its links and stored queries.
struct FileSchema {
    const std::vector<TableDef>* tables;
    std::vector<std::pair<QString, QString>> links; // table -> file name of its source in the data folder
    const std::vector<std::pair<const char*, const char*>>* queries;
};

std::optional<FileSchema> schemaOf(const QString& fileName)
{
    if (fileName.compare(dbfiles::Items, Qt::CaseInsensitive) == 0)
        return FileSchema{&itemsTables(), {}, &itemsQueries()};
    if (fileName.compare(dbfiles::TempDocs, Qt::CaseInsensitive) == 0) {
        FileSchema f{&tempDocsTables(), {}, &tempDocsQueries()};
        for (const char* t : {"tDocTypes", "tCSTable", "tCurrencies", "tWizFiles", "tWizFileRanges"})
            f.links.emplace_back(QLatin1String(t), dbfiles::Config);
        for (const char* t : {"tItems", "tAlterKeys", "tAlterPrices", "tPriceList", "tAccountDef"})
            f.links.emplace_back(QLatin1String(t), dbfiles::Items);
        return f;
    }
    if (fileName.compare(dbfiles::TempItems, Qt::CaseInsensitive) == 0) {
        FileSchema f{&tempItemsTables(), {}, &tempItemsQueries()};
        for (const char* t : {"tItems", "tAlterKeys", "tAlterPrices", "tPriceList"})
            f.links.emplace_back(QLatin1String(t), dbfiles::Items);
        return f;
    }
    return std::nullopt;
}

// A CREATE TABLE text in its parts: the column and table-constraint
// definitions split at their top-level commas, and what follows the list.
struct TableText {
    QStringList parts;
    QString tail;
    bool ok = false;
};

TableText splitTableSql(const QString& sql)
{
    TableText t;
    const int open = sql.indexOf(QLatin1Char('('));
    if (open < 0)
        return t;
    int depth = 0;
    int start = open + 1;
    QChar closing;
    for (int i = open; i < sql.size(); ++i) {
        const QChar c = sql[i];
        if (!closing.isNull()) {
            if (c == closing)
                closing = QChar();
            continue;
        }
        if (c == QLatin1Char('\'') || c == QLatin1Char('"') || c == QLatin1Char('`'))
            closing = c;
        else if (c == QLatin1Char('['))
            closing = QLatin1Char(']');
        else if (c == QLatin1Char('('))
            ++depth;
        else if (c == QLatin1Char(',') && depth == 1) {
            t.parts << sql.mid(start, i - start).trimmed();
            start = i + 1;
        } else if (c == QLatin1Char(')') && --depth == 0) {
            t.parts << sql.mid(start, i - start).trimmed();
            t.tail = sql.mid(i + 1);
            t.ok = true;
            return t;
        }
    }
    return t;
}

// The column a definition declares, or empty text for a table constraint.
QString definedColumn(const QString& part)
{
    if (part.isEmpty())
        return QString();
    const QChar first = part[0];
    if (first == QLatin1Char('"') || first == QLatin1Char('`') || first == QLatin1Char('[')) {
        const QChar closing = first == QLatin1Char('[') ? QLatin1Char(']') : first;
        const int end = part.indexOf(closing, 1);
        return end < 0 ? QString() : part.mid(1, end - 1);
    }
    int end = 0;
    while (end < part.size() && !part[end].isSpace())
        ++end;
    const QString word = part.left(end);
    for (const char* k : {"CONSTRAINT", "PRIMARY", "UNIQUE", "CHECK", "FOREIGN"})
        if (word.compare(QLatin1String(k), Qt::CaseInsensitive) == 0)
            return QString();
    return word;
}

bool collatesNoCase(const QString& part)
{
    static const QRegularExpression collate(QStringLiteral("\\bCOLLATE\\s+[\"'`\\[]?NOCASE\\b"),
                                            QRegularExpression::CaseInsensitiveOption);
    return collate.match(part).hasMatch();
}

QString quotedName(const QString& name)
{
    QString n = name;
    n.replace(QLatin1Char('"'), QLatin1String("\"\""));
    return QLatin1Char('"') + n + QLatin1Char('"');
}

// The stored tables of a file that this system makes, by name.
bool isSystemTable(const QString& name)
{
    for (const auto* list : {&itemsTables(), &tempDocsTables(), &tempItemsTables()})
        for (const TableDef& t : *list)
            if (name.compare(QLatin1String(t.name), Qt::CaseInsensitive) == 0)
                return true;
    return false;
}

struct PendingTable {
    QString name;
    TableText stored;   // as the file holds it
    TableText caseless; // with COLLATE NOCASE on every column of ignoresCase
};

// Replaces one table by a copy whose key columns ignore case, inside the
// caller's transaction. Rows keep their order and row ids where a column
// carries them; rows whose key the new table already holds go to the side table.
DbError rebuildCaseless(Database& db, const PendingTable& t, CaselessKeysReport& report)
{
    const QString table = quotedName(t.name);
    const QString building = quotedName(t.name + QStringLiteral("_caseless"));
    DbError e;

    QStringList columns, keyColumns;
    {
        Statement info = db.prepare(QStringLiteral("SELECT name, pk FROM pragma_table_info(?1) ORDER BY cid"), &e);
        if (e)
            return e;
        info.bind(1, t.name);
        std::vector<std::pair<int, QString>> key;
        Statement::Step st;
        while ((st = info.step()) == Statement::Step::Row) {
            columns << quotedName(info.value(0).toString());
            if (info.value(1).toInt() > 0)
                key.emplace_back(info.value(1).toInt(), info.value(0).toString());
        }
        if (st == Statement::Step::Error)
            return info.error();
        std::sort(key.begin(), key.end());
        for (const auto& k : key)
            keyColumns << k.second;
    }
    const QString columnList = columns.join(QStringLiteral(", "));
    bool caselessKey = false;
    for (const QString& k : keyColumns)
        caselessKey = caselessKey || ignoresCase(k);

    // Indexes and triggers of its own go with a dropped table; they come back after.
    QStringList dependents;
    {
        Statement s = db.prepare(QStringLiteral("SELECT sql FROM main.sqlite_master WHERE type IN ('index', 'trigger')"
                                                " AND tbl_name = ?1 AND sql IS NOT NULL"),
                                 &e);
        if (e)
            return e;
        s.bind(1, t.name);
        while (s.step() == Statement::Step::Row)
            dependents << s.value(0).toString();
        if (s.error())
            return s.error();
    }
    // A dropped table takes its AUTOINCREMENT counter along; numbers it gave
    // to rows since deleted must not be given again.
    QVariant sequence;
    if (t.stored.parts.join(QLatin1Char(' ')).contains(QLatin1String("AUTOINCREMENT"), Qt::CaseInsensitive)) {
        Statement s = db.prepare(QStringLiteral("SELECT seq FROM main.sqlite_sequence WHERE name = ?1"), &e);
        if (!e) {
            s.bind(1, t.name);
            if (s.step() == Statement::Step::Row)
                sequence = s.value(0);
        }
    }

    if ((e = db.exec(QStringLiteral("CREATE TABLE %1 (%2)%3")
                         .arg(building, t.caseless.parts.join(QStringLiteral(", ")), t.caseless.tail))))
        return e;
    const long long before = db.scalar(QStringLiteral("SELECT count(*) FROM %1").arg(table), &e).toLongLong();
    if (e)
        return e;
    // In stored order, so of keys that are now equal the first stored one stays.
    if ((e = db.exec(QStringLiteral("INSERT %1 INTO %2 (%3) SELECT %3 FROM %4 ORDER BY rowid")
                         .arg(caselessKey ? QStringLiteral("OR IGNORE") : QString(), building, columnList, table))))
        return e;
    const long long kept = db.scalar(QStringLiteral("SELECT count(*) FROM %1").arg(building), &e).toLongLong();
    if (e)
        return e;
    if (kept < before) {
        // The rows left behind are those whose exact key the new table lacks.
        QStringList match;
        for (const QString& k : keyColumns) {
            const QString n = quotedName(k);
            match << QStringLiteral("n.%1 IS o.%1").arg(n);
            if (ignoresCase(k))
                match << QStringLiteral("n.%1 IS o.%1 COLLATE BINARY").arg(n);
        }
        QStringList sideColumns;
        for (const QString& part : t.stored.parts)
            if (!definedColumn(part).isEmpty())
                sideColumns << part;
        const QString sideName = t.name + QStringLiteral("CaseDup");
        const QString side = quotedName(sideName);
        if ((e = db.exec(QStringLiteral("CREATE TABLE IF NOT EXISTS %1 (%2)").arg(side, sideColumns.join(QStringLiteral(", "))))))
            return e;
        if ((e = db.exec(QStringLiteral("INSERT INTO %1 (%2) SELECT %3 FROM %4 o WHERE NOT EXISTS"
                                        " (SELECT 1 FROM %5 n WHERE %6) ORDER BY o.rowid")
                             .arg(side, columnList, QStringLiteral("o.") + columns.join(QStringLiteral(", o.")), table,
                                  building, match.join(QStringLiteral(" AND "))))))
            return e;
        const int moved = db.changes();
        if (kept + moved != before)
            return DbError::other(QStringLiteral("שדרוג הטבלה '%1' נעצר: %2 רשומות לא נמצא להן מקום")
                                      .arg(t.name)
                                      .arg(before - kept - moved));
        report.setAside += moved;
        if (!report.sideTables.contains(sideName))
            report.sideTables << sideName;
    }
    if ((e = db.exec(QStringLiteral("DROP TABLE %1").arg(table))))
        return e;
    // The stored queries are views of this connection over the old table; the
    // rename must not try to rewrite them, as they find the new one by name.
    if ((e = db.exec(QStringLiteral("PRAGMA legacy_alter_table = ON"))))
        return e;
    e = db.exec(QStringLiteral("ALTER TABLE %1 RENAME TO %2").arg(building, table));
    db.exec(QStringLiteral("PRAGMA legacy_alter_table = OFF"));
    if (e)
        return e;
    for (const QString& sql : dependents)
        if ((e = db.exec(sql)))
            return e;
    if (sequence.isValid()) {
        Statement s = db.prepare(QStringLiteral("UPDATE main.sqlite_sequence SET seq = max(seq, ?2) WHERE name = ?1"), &e);
        if (e)
            return e;
        s.bind(1, t.name);
        s.bind(2, sequence);
        if ((e = s.run()))
            return e;
        if (db.changes() == 0) {
            Statement add = db.prepare(QStringLiteral("INSERT INTO main.sqlite_sequence (name, seq) VALUES (?1, ?2)"), &e);
            if (e)
                return e;
            add.bind(1, t.name);
            add.bind(2, sequence);
            if ((e = add.run()))
                return e;
        }
    }
    report.rebuilt << t.name;
    return {};
}
} // namespace

QString declaredType(const FieldDef& f)
{
    switch (f.type) {
    case T::Boolean: return QStringLiteral("BOOLEAN");
    case T::Byte: return QStringLiteral("TINYINT");
    case T::Integer: return QStringLiteral("SMALLINT");
    case T::Long: return QStringLiteral("INTEGER");
    case T::Double: return QStringLiteral("DOUBLE");
    case T::DateTime: return QStringLiteral("DATETIME");
    case T::Text: return QStringLiteral("TEXT(%1)").arg(f.size);
    }
    return QString();
}

bool ignoresCase(const QString& column)
{
    static const char* const names[]
        = {"ItemKey", "ItemKeySon", "AccountKey", "OrigAccountKey", "AlterNum", "AlterBar", "ItemSort"};
    for (const char* n : names)
        if (column.compare(QLatin1String(n), Qt::CaseInsensitive) == 0)
            return true;
    return false;
}

QString createTableSql(const TableDef& t)
{
    QStringList columns;
    for (size_t i = 0; i < t.fields.size(); ++i) {
        const FieldDef& f = t.fields[i];
        QString c = quoteName(f.name) + QLatin1Char(' ') + declaredType(f);
        if (f.type == T::Text && ignoresCase(QLatin1String(f.name)))
            c += QStringLiteral(" COLLATE NOCASE");
        if (i == 0 && t.autoIncrementFirst) {
            c += QStringLiteral(" CONSTRAINT PrimaryKey PRIMARY KEY AUTOINCREMENT");
        } else {
            for (const char* k : t.key)
                if (qstrcmp(k, f.name) == 0)
                    c += QStringLiteral(" NOT NULL");
        }
        columns << c;
    }
    if (!t.autoIncrementFirst) {
        QStringList key;
        for (const char* k : t.key)
            key << quoteName(k);
        columns << QStringLiteral("CONSTRAINT PrimaryKey PRIMARY KEY (%1)").arg(key.join(QStringLiteral(", ")));
    }
    return QStringLiteral("CREATE TABLE %1 (%2)").arg(quoteName(t.name), columns.join(QStringLiteral(", ")));
}

const std::vector<TableDef>& tempDocsTables()
{
    static const std::vector<TableDef> tables = [] {
        std::vector<TableDef> t;
        t.push_back({"tTempDocHeaders",
                     {{"WizFileID", T::Long},       {"Number", T::Long},          {"DocType", T::Integer},
                      {"Reference1", T::Text, 16},  {"DocDate", T::DateTime},     {"AccountKey", T::Text, 20},
                      {"Include", T::Boolean},      {"CardName", T::Text, 100},   {"Address", T::Text, 254},
                      {"City", T::Text, 100},       {"ZipCode", T::Text, 254},    {"MailAddress", T::Text, 100},
                      {"MailZipCod", T::Text, 20},  {"CntctPrsn", T::Text, 90},   {"TotalCrates", T::Integer},
                      {"Copies", T::Integer},       {"Phone1", T::Text, 50},      {"Phone2", T::Text, 50},
                      {"NumAtCard", T::Text, 20},   {"MailCity", T::Text, 50},    {"MailCounty", T::Text, 50},
                      {"MailCountry", T::Text, 50}, {"IsDraft", T::Boolean},      {"PackRem", T::Text, 250},
                      {"OrigAccountKey", T::Text, 20}},
                     {"WizFileID", "Number"}});
        t.push_back({"tTempDocLines",
                     {{"WizFileID", T::Long},      {"HeadNumber", T::Long},       {"LineNum", T::Integer},
                      {"Number", T::Long},         {"ItemKey", T::Text, 25},      {"ItemName", T::Text, 100},
                      {"Quantity", T::Double},     {"Warehouse", T::Integer},     {"Copies", T::Integer},
                      {"Include", T::Boolean},     {"SerialNum", T::Text, 20},    {"AlterNum", T::Text, 25},
                      {"PackUN", T::Double},       {"PackCopies", T::Long},       {"ExtraSum1", T::Double},
                      {"ExtraSum2", T::Double},    {"ExtraSum3", T::Double},      {"AgentID", T::Long},
                      {"ItemKeySon", T::Text, 25}, {"ItemNameSon", T::Text, 100}, {"Details", T::Text, 20}},
                     {"WizFileID", "HeadNumber", "LineNum"}});
        t.push_back({"tTempLineMore",
                     {{"WizFileID", T::Long}, {"HeadNumber", T::Long}, {"Number", T::Long}, {"LineNum", T::Integer},
                      {"Packs", T::Long}},
                     {"WizFileID", "HeadNumber", "LineNum"}});
        t.push_back({"tAgents", {{"AgentID", T::Long}, {"AgentName", T::Text, 50}}, {"AgentID"}});
        TableDef labData{"tPLabData", {{"KLine", T::Long}, {"Copies", T::Integer}, {"LabelID", T::Long}, {"LineSort", T::Long}},
                         {"KLine"}};
        static const char* const pars[20] = {"Par1",  "Par2",  "Par3",  "Par4",  "Par5",  "Par6",  "Par7",
                                             "Par8",  "Par9",  "Par10", "Par11", "Par12", "Par13", "Par14",
                                             "Par15", "Par16", "Par17", "Par18", "Par19", "Par20"};
        for (const char* p : pars)
            labData.fields.push_back({p, T::Text, 100});
        t.push_back(labData);
        t.push_back({"tPLabDef", {{"LabelID", T::Long}, {"LabelName", T::Text, 50}, {"LabelPath", T::Text, 100}},
                     {"LabelID"}});
        t.push_back({"tPLName", {{"PLID", T::Long}, {"PLName", T::Text, 100}}, {"PLID"}});
        return t;
    }();
    return tables;
}

const std::vector<TableDef>& itemsTables()
{
    static const std::vector<TableDef> tables = {
        {"tItems", itemFields(false), {"ItemKey"}},
        alterKeys("tAlterKeys"),
        alterPrices("tAlterPrices"),
        {"tAccountDef",
         {{"DefID", T::Long}, {"AccountKey", T::Text, 20}, {"PriceList", T::Long}, {"LabelName", T::Text, 50},
          {"Include", T::Boolean}},
         {"DefID"},
         true},
        priceList("tPriceList"),
    };
    return tables;
}

const std::vector<TableDef>& tempItemsTables()
{
    static const std::vector<TableDef> tables = {
        {"tTempItems", itemFields(true), {"ItemKey"}},
        alterKeys("tTempAlterKeys"),
        alterPrices("tTempAlterPrices"),
        priceList("tTempPriceList"),
    };
    return tables;
}

DbError AttachTable(Database& db, const QString& sourcePath, const QString& table)
{
    return db.attachTable(sourcePath, table);
}

static std::vector<std::pair<QString, QString>> tempDocsLinks(const QString& configPath, const QString& itemsPath)
{
    std::vector<std::pair<QString, QString>> links;
    const FileSchema schema = *schemaOf(dbfiles::TempDocs);
    for (const auto& [table, file] : schema.links)
        links.emplace_back(file == dbfiles::Config ? configPath : itemsPath, table);
    return links;
}

QString CreateTempDocsDB(const QString& configPath, const QString& itemsPath, const QString& tempDocsPath,
                         DbError* error)
{
    return createDatabase(tempDocsPath, tempDocsTables(), tempDocsLinks(configPath, itemsPath), tempDocsQueries(), error);
}

QString CreateItemsDB(const QString& itemsPath, DbError* error)
{
    return createDatabase(itemsPath, itemsTables(), {}, itemsQueries(), error);
}

QString CreateTempItemsDB(const QString& tempItemsPath, const QString& itemsPath, DbError* error)
{
    std::vector<std::pair<QString, QString>> links;
    const FileSchema schema = *schemaOf(dbfiles::TempItems);
    for (const auto& [table, file] : schema.links)
        links.emplace_back(itemsPath, table);
    return createDatabase(tempItemsPath, tempItemsTables(), links, tempItemsQueries(), error);
}

QStringList MissingObjects(const QString& path, DbError* error)
{
    DbError local;
    DbError& e = error ? *error : local;
    e = {};
    const auto schema = schemaOf(QFileInfo(path).fileName());
    if (!schema || !QFileInfo::exists(path))
        return {};
    Database db;
    if ((e = db.open(path, Database::OpenMode::ReadOnly)))
        return {};
    QStringList have;
    Statement tables = db.prepare(QStringLiteral("SELECT name FROM main.sqlite_master WHERE type = 'table'"), &e);
    while (!e && tables.step() == Statement::Step::Row)
        have << tables.value(0).toString().toLower();
    if (e)
        return {};
    QStringList catalog;
    if (have.contains(kCatalogTable.toLower())) {
        Statement rows = db.prepare(QStringLiteral("SELECT Name, Kind FROM main.%1").arg(kCatalogTable), &e);
        while (!e && rows.step() == Statement::Step::Row)
            catalog << (rows.value(1).toString() == QLatin1String("link") ? QStringLiteral("link:") : QStringLiteral("query:"))
                           + rows.value(0).toString().toLower();
        if (e)
            return {};
    }
    QStringList missing;
    for (const TableDef& t : *schema->tables)
        if (!have.contains(QString::fromLatin1(t.name).toLower()))
            missing << QLatin1String(t.name);
    for (const auto& [table, file] : schema->links)
        if (!catalog.contains(QStringLiteral("link:") + table.toLower()))
            missing << table;
    for (const auto& [name, sql] : *schema->queries)
        if (!catalog.contains(QStringLiteral("query:") + QString::fromLatin1(name).toLower()))
            missing << QLatin1String(name);
    return missing;
}

DbError CompleteDatabase(const QString& path, QStringList* added)
{
    if (added)
        added->clear();
    const auto schema = schemaOf(QFileInfo(path).fileName());
    if (!schema)
        return DbError::other(QStringLiteral("'%1' אינו אחד מבסיסי הנתונים של המערכת").arg(QDir::toNativeSeparators(path)));
    DbError e;
    const QStringList missing = MissingObjects(path, &e);
    if (e || missing.isEmpty())
        return e;
    const QString folder = QFileInfo(path).absolutePath();
    // A file lacking links was stopped before its rows could come (they come
    // only after a whole creation), and links cannot be added inside a
    // transaction: such a file is built again, aside.
    for (const auto& [table, file] : schema->links) {
        if (!missing.contains(table))
            continue;
        const QString items = joinDataPath(folder, dbfiles::Items);
        const QString made = QFileInfo(path).fileName().compare(dbfiles::TempDocs, Qt::CaseInsensitive) == 0
                                 ? CreateTempDocsDB(joinDataPath(folder, dbfiles::Config), items, path, &e)
                                 : CreateTempItemsDB(path, items, &e);
        if (!made.isEmpty() && added)
            *added = missing;
        return e;
    }
    Database db;
    if ((e = db.open(path)))
        return e;
    // All or nothing, so a run stopped here leaves the file as it found it.
    Transaction tx(db);
    if ((e = tx.error()))
        return e;
    for (const TableDef& t : *schema->tables) {
        if (!missing.contains(QLatin1String(t.name)))
            continue;
        if ((e = db.exec(createTableSql(t))))
            return e;
        // The items database is made upgraded by everything that makes it.
        if (qstrcmp(t.name, "tAccountDef") == 0 && (e = addUpgradeColumns(db)))
            return e;
    }
    for (const auto& [name, sql] : *schema->queries)
        if (missing.contains(QLatin1String(name)) && (e = db.createQuery(QLatin1String(name), QString::fromUtf8(sql))))
            return e;
    if ((e = tx.commit()))
        return e;
    if (added)
        *added = missing;
    return {};
}

QStringList RemoveLeftoverBuilds(const QString& folder)
{
    static const QRegularExpression leftover(
        QStringLiteral("^(tagora\\.tdb|tgrmitm\\.tdb|tgrrtdb\\.tmp|tgrlabti\\.tmp)\\.building-([A-Za-z0-9_]+)-([0-9]+)"
                       "(-journal|-wal|-shm)?$"),
        QRegularExpression::CaseInsensitiveOption);
    QStringList removed;
    QDir dir(folder);
    const QString host = thisHost();
    for (const QFileInfo& entry : dir.entryInfoList(QDir::Files | QDir::Hidden | QDir::System)) {
        // The copy of the supplied configuration was made under this name before.
        const bool oldCopy = entry.fileName().compare(dbfiles::Config + QStringLiteral(".new"), Qt::CaseInsensitive) == 0;
        const QRegularExpressionMatch m = leftover.match(entry.fileName());
        if (!oldCopy && !m.hasMatch())
            continue;
        if (entry.isSymLink())
            continue;
        // A build of another machine, or of a process still running here, is not a leftover.
        if (m.hasMatch() && (m.captured(2) != host || processRunning(m.captured(3).toLongLong())))
            continue;
        if (dir.remove(entry.fileName()))
            removed << entry.fileName();
    }
    return removed;
}

DbError RepairDataFolder(const QString& folder, QStringList* repaired)
{
    if (repaired)
        repaired->clear();
    if (!QFileInfo(folder).isDir())
        return {};
    RemoveLeftoverBuilds(folder);
    // The items database first: the documents database links to its tables.
    for (const QString& name : {dbfiles::Items, dbfiles::TempDocs, dbfiles::TempItems}) {
        const QString path = joinDataPath(folder, name);
        if (!QFileInfo::exists(path))
            continue;
        QStringList added;
        if (DbError e = CompleteDatabase(path, &added)) {
            e.message = QStringLiteral("בסיס הנתונים '%1' לא נוצר עד סופו, ולא ניתן להשלים אותו: %2")
                            .arg(QDir::toNativeSeparators(path), e.message);
            return e;
        }
        if (repaired && !added.isEmpty())
            *repaired << name;
    }
    return {};
}

QString UpgradeAccountDef(const QString& itemsPath, DbError* error)
{
    DbError local;
    DbError& e = error ? *error : local;
    e = {};
    if (!QFileInfo::exists(itemsPath)) {
        e = DbError::notFound(QStringLiteral("בסיס הנתונים אינו נמצא"));
        return QString();
    }
    Database db;
    if ((e = db.open(itemsPath)))
        return QString();
    // All three fields or none: a second run fails on the first and changes nothing.
    Transaction tx(db);
    if ((e = tx.error()))
        return QString();
    if ((e = addUpgradeColumns(db)))
        return QString();
    if ((e = tx.commit()))
        return QString();
    db.close();
    return itemsPath;
}

DbError UpgradeCaselessKeys(const QString& path, CaselessKeysReport* report)
{
    CaselessKeysReport local;
    CaselessKeysReport& r = report ? *report : local;
    r = {};
    if (!QFileInfo::exists(path))
        return DbError::notFound(QStringLiteral("בסיס הנתונים אינו נמצא"));
    Database db;
    if (DbError e = db.open(path))
        return e;

    // Decided from the stored text alone, so a file already done costs one read.
    std::vector<PendingTable> pending;
    {
        DbError e;
        Statement s = db.prepare(QStringLiteral("SELECT name, sql FROM main.sqlite_master WHERE type = 'table' ORDER BY rowid"), &e);
        if (e)
            return e;
        Statement::Step st;
        while ((st = s.step()) == Statement::Step::Row) {
            const QString name = s.value(0).toString();
            if (!isSystemTable(name))
                continue;
            PendingTable t{name, splitTableSql(s.value(1).toString()), {}};
            if (!t.stored.ok)
                continue;
            t.caseless = t.stored;
            bool changed = false;
            for (QString& part : t.caseless.parts) {
                if (ignoresCase(definedColumn(part)) && !collatesNoCase(part)) {
                    part += QStringLiteral(" COLLATE NOCASE");
                    changed = true;
                }
            }
            if (changed)
                pending.push_back(t);
        }
        if (st == Statement::Step::Error)
            return s.error();
    }
    if (pending.empty())
        return {};

    Transaction tx(db);
    if (DbError e = tx.error())
        return e;
    CaselessKeysReport done;
    for (const PendingTable& t : pending)
        if (DbError e = rebuildCaseless(db, t, done))
            return e;
    if (DbError e = tx.commit())
        return e;
    r = done;
    return {};
}

DbError InstallConfigDatabase(const QString& path)
{
    // The build makes the file from its SQL script and carries it inside the library.
    QFile supplied(QStringLiteral(":/tagora/tagora.tdb"));
    if (!supplied.exists())
        return DbError::other(QStringLiteral("בסיס נתוני ההגדרות חסר בגרסה זו"));
    // Copied aside, on the disk, and only then moved into place: a failure
    // or a killed run leaves no half file under the name.
    const QString building = BuildingPath(path);
    QFile::remove(building);
    bool ok = supplied.copy(building)
              && QFile::setPermissions(building, QFile::ReadOwner | QFile::WriteOwner | QFile::ReadGroup | QFile::ReadOther);
    if (ok) {
        QFile copy(building);
        ok = copy.open(QIODevice::ReadWrite);
#ifdef Q_OS_UNIX
        ok = ok && ::fsync(copy.handle()) == 0;
#endif
    }
    // The name is taken only when free: a file another run put there meanwhile stays.
    if (!ok || !QFile::rename(building, path)) {
        QFile::remove(building);
        return DbError::other(QStringLiteral("לא ניתן ליצור את הקובץ '%1'").arg(QDir::toNativeSeparators(path)));
    }
    return {};
}

DbError PrepareDataFolder(const QString& folder)
{
    if (!QDir().mkpath(folder))
        return DbError::other(QStringLiteral("לא ניתן ליצור את התיקייה '%1'").arg(QDir::toNativeSeparators(folder)));
    if (DbError e = RepairDataFolder(folder))
        return e;
    const QString config = joinDataPath(folder, dbfiles::Config);
    if (!QFileInfo::exists(config))
        if (DbError e = InstallConfigDatabase(config))
            return e;
    const QString items = joinDataPath(folder, dbfiles::Items);
    if (!QFileInfo::exists(items)) {
        // Upgraded before it takes its name, so no run finds it half made.
        DbError e;
        if (createDatabase(items, itemsTables(), {}, itemsQueries(), &e, addUpgradeColumns).isEmpty())
            return e;
    }
    return {};
}

} // namespace tagora
