#pragma once

#include "localdb/database.h"

#include <QString>
#include <QStringList>
#include <vector>

namespace tagora {

// File names of the four local databases in the data folder.
namespace dbfiles {
inline const QString Config = QStringLiteral("tagora.tdb");
inline const QString Items = QStringLiteral("tgrmitm.tdb");
inline const QString TempDocs = QStringLiteral("tgrrtdb.tmp");
inline const QString TempItems = QStringLiteral("tgrlabti.tmp");
} // namespace dbfiles

// Field types, kept recognisable in the declared column types.
enum class FieldType { Boolean, Byte, Integer, Long, Double, DateTime, Text };

struct FieldDef {
    const char* name;
    FieldType type;
    int size = 0; // text width in characters
};

struct TableDef {
    const char* name;
    std::vector<FieldDef> fields;
    std::vector<const char*> key;
    bool autoIncrementFirst = false;
};

// The declared SQL of a field type: TEXT(25), INTEGER, SMALLINT, DOUBLE ...
QString declaredType(const FieldDef& field);
// Whether a text column holds a key that compares without regard to case, as
// every text did in the files of the system this one replaces: item and
// account keys, alternate numbers and barcodes, and the family an item range
// is bounded by. Such columns are declared COLLATE NOCASE, so a comparison, a
// join, an order or a key that starts from them ignores the case of Latin
// letters (Hebrew has none). Decided by the column's name, in every file.
bool ignoresCase(const QString& column);
// CREATE TABLE text of a definition.
QString createTableSql(const TableDef& table);

// The own tables of each file the system creates, in creation order.
const std::vector<TableDef>& tempDocsTables();
const std::vector<TableDef>& itemsTables();
const std::vector<TableDef>& tempItemsTables();

// Builds each file from nothing, aside (under the target's name followed by
// ".building-HOST-PID"), and puts it in place of the file at the path only
// when whole: a failure, or a run killed half way, leaves the earlier file
// (or none). Returns the path, or empty text with the engine's error.
// The name a file is built under beside target by this process.
QString BuildingPath(const QString& target);

QString CreateTempDocsDB(const QString& configPath, const QString& itemsPath, const QString& tempDocsPath,
                         DbError* error);
QString CreateItemsDB(const QString& itemsPath, DbError* error);
QString CreateTempItemsDB(const QString& tempItemsPath, const QString& itemsPath, DbError* error);

// Adds FldID, FldMaxLen and Label2Name to tAccountDef, all or nothing.
// A missing file gives a NotFound error with "בסיס הנתונים אינו נמצא".
QString UpgradeAccountDef(const QString& itemsPath, DbError* error);

// What UpgradeCaselessKeys did to a file.
struct CaselessKeysReport {
    QStringList rebuilt;    // tables whose key columns now ignore case
    int setAside = 0;       // rows moved into side tables
    QStringList sideTables; // the side tables that received them
};

// Brings a file made before keys ignored case to the schema of new files:
// every table of the system whose stored text lacks COLLATE NOCASE on a column
// of ignoresCase is rebuilt (a column's collation cannot change in place),
// all tables of the file in one transaction, rows and row ids kept. Where two
// stored keys become one (AB'12 and ab'12), the row stored first stays and
// the others move whole into the side table named after the table with
// "CaseDup" appended (tItemsCaseDup), so nothing is lost. A file that is
// already done is only read. A missing file gives a NotFound error.
DbError UpgradeCaselessKeys(const QString& path, CaselessKeysReport* report = nullptr);

// Links a table of another file into the open database under its own name.
DbError AttachTable(Database& db, const QString& sourcePath, const QString& table);

// What a file of the system lacks of its schema: own tables, and links and
// stored queries in its catalog, by name. Decided by the file's name
// (tgrmitm.tdb, tgrrtdb.tmp, tgrlabti.tmp); empty for a complete file, a
// missing one or another name. A file that cannot be read gives the error.
QStringList MissingObjects(const QString& path, DbError* error = nullptr);

// Completes such a file. Missing tables (tAccountDef with its upgrade
// fields) and stored queries are made in place, in one transaction, and the
// rows the file holds stay. A file lacking links (a temporary database whose
// creation stopped before its rows could come) is built again aside, linked
// to the files of the data folder it lies in. added receives what was
// missing.
DbError CompleteDatabase(const QString& path, QStringList* added = nullptr);

// Removes what a killed build left in the folder: files aside of the four
// databases (and their journals) whose process, on this machine, is gone.
// Builds of a running process or of another machine, and every other file,
// stay. Returns the names removed.
QStringList RemoveLeftoverBuilds(const QString& folder);

// Before a data folder is used: leftover builds removed, and each database
// of the folder that lacks part of its schema completed (repaired receives
// their names). Missing files are not made here.
DbError RepairDataFolder(const QString& folder, QStringList* repaired = nullptr);

// Makes the data folder ready for a first run: the folder, then the repair
// above, then the supplied configuration database and an empty (upgraded)
// items database, each only when missing. Nothing complete is touched.
DbError PrepareDataFolder(const QString& folder);

// Writes the supplied configuration database to path (which must not exist).
DbError InstallConfigDatabase(const QString& path);

} // namespace tagora
