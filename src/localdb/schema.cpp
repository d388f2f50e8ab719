#include "localdb/schema.h"

#include "platform/platformdefaults.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>

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

// Runs the creation steps in order; stops at the first error, leaving what
// was made so far, as the next creation starts by deleting the file anyway.
QString createDatabase(const QString& path, const std::vector<TableDef>& tables,
                       const std::vector<std::pair<QString, QString>>& links,
                       const std::vector<std::pair<const char*, const char*>>& queries, DbError* error)
{
    DbError local;
    DbError& e = error ? *error : local;
    e = {};
    if (!removeDatabaseFile(path, &e))
        return QString();
    Database db;
    if ((e = db.open(path, Database::OpenMode::Create)))
        return QString();
    for (const TableDef& t : tables)
        if ((e = db.exec(createTableSql(t))))
            return QString();
    for (const auto& [source, table] : links)
        if ((e = AttachTable(db, source, table)))
            return QString();
    for (const auto& [name, sql] : queries)
        if ((e = db.createQuery(QLatin1String(name), QString::fromUtf8(sql))))
            return QString();
    db.close();
    return path;
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

QString createTableSql(const TableDef& t)
{
    QStringList columns;
    for (size_t i = 0; i < t.fields.size(); ++i) {
        const FieldDef& f = t.fields[i];
        QString c = quoteName(f.name) + QLatin1Char(' ') + declaredType(f);
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
         {{"DefID", T::Long}, {"AccountKey", T::Text, 20}, {"PriceList", T::Integer}, {"LabelName", T::Text, 50},
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

QString CreateTempDocsDB(const QString& configPath, const QString& itemsPath, const QString& tempDocsPath,
                         DbError* error)
{
    std::vector<std::pair<QString, QString>> links;
    for (const char* t : {"tDocTypes", "tCSTable", "tCurrencies", "tWizFiles", "tWizFileRanges"})
        links.emplace_back(configPath, QLatin1String(t));
    for (const char* t : {"tItems", "tAlterKeys", "tAlterPrices", "tPriceList", "tAccountDef"})
        links.emplace_back(itemsPath, QLatin1String(t));
    return createDatabase(tempDocsPath, tempDocsTables(), links, tempDocsQueries(), error);
}

QString CreateItemsDB(const QString& itemsPath, DbError* error)
{
    return createDatabase(itemsPath, itemsTables(), {}, itemsQueries(), error);
}

QString CreateTempItemsDB(const QString& tempItemsPath, const QString& itemsPath, DbError* error)
{
    std::vector<std::pair<QString, QString>> links;
    for (const char* t : {"tItems", "tAlterKeys", "tAlterPrices", "tPriceList"})
        links.emplace_back(itemsPath, QLatin1String(t));
    return createDatabase(tempItemsPath, tempItemsTables(), links, tempItemsQueries(), error);
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
    for (const char* column : {"FldID SMALLINT", "FldMaxLen SMALLINT", "Label2Name TEXT(50)"})
        if ((e = db.exec(QStringLiteral("ALTER TABLE tAccountDef ADD COLUMN %1").arg(QLatin1String(column)))))
            return QString();
    if ((e = tx.commit()))
        return QString();
    db.close();
    return itemsPath;
}

DbError InstallConfigDatabase(const QString& path)
{
    // The build makes the file from its SQL script and carries it inside the library.
    QFile supplied(QStringLiteral(":/tagora/tagora.tdb"));
    if (!supplied.exists())
        return DbError::other(QStringLiteral("בסיס נתוני ההגדרות חסר בגרסה זו"));
    // Copy beside the target and move into place, so a failure leaves no half file.
    const QString building = path + QStringLiteral(".new");
    QFile::remove(building);
    if (!supplied.copy(building)
        || !QFile::setPermissions(building, QFile::ReadOwner | QFile::WriteOwner | QFile::ReadGroup | QFile::ReadOther)
        || !QFile::rename(building, path)) {
        QFile::remove(building);
        return DbError::other(QStringLiteral("לא ניתן ליצור את הקובץ '%1'").arg(QDir::toNativeSeparators(path)));
    }
    return {};
}

DbError PrepareDataFolder(const QString& folder)
{
    if (!QDir().mkpath(folder))
        return DbError::other(QStringLiteral("לא ניתן ליצור את התיקייה '%1'").arg(QDir::toNativeSeparators(folder)));
    const QString config = joinDataPath(folder, dbfiles::Config);
    if (!QFileInfo::exists(config))
        if (DbError e = InstallConfigDatabase(config))
            return e;
    const QString items = joinDataPath(folder, dbfiles::Items);
    if (!QFileInfo::exists(items)) {
        DbError e;
        if (CreateItemsDB(items, &e).isEmpty() || UpgradeAccountDef(items, &e).isEmpty())
            return e;
    }
    return {};
}

} // namespace tagora
