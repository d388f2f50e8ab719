#pragma once

#include "erp/itemimport.h"
#include "erp/odbc.h"

#include <QString>
#include <QVariant>
#include <QVector>
#include <functional>

namespace tagora {

class Database;
struct DbError;

// What the user set on the documents tab, as typed: the import reads and
// checks it, so the screen only copies its boxes in.
struct DocImportOptions {
    QString dataFolder;
    QString fromDate; // d/m/yy; empty: no bound
    QString toDate;
    QString fromDocNum; // document numbers, compared as text; empty: no bound
    QString toDocNum;
    QString refPref;    // put before both numbers when they are given
    int qtyFrom = 0;    // quantity rule: the list index of the quantity source (-1: none chosen)
    QString qtyFactor;  // used when it is a number, else 1
    bool onlyLine0 = false;
    bool readDocItems = false;
    bool withExport = false; // passed on, changes nothing
};

// Quantity rules, by the quantity source's list index.
enum QtyRule {
    QtyLine = 0,
    QtyHeaderDetails = 1,
    QtyFactoryUnit = 2,
    QtyPackages = 3,
    QtyFixed = 4,
};

// One document type with its import recipe: a row of qDocTypes.
struct DocTypeRecipe {
    int docType = 0;
    QString docDesc;
    int wizFileId = 0;
    QVariant vType; // null: no TYPE condition
    bool include = false;
    bool includeDraft = false;
    int csTableId = 0;
    QString headTable, lineTable, fldID, fldRef1, fldRef2, fldDate, fldLineID, fldDocCSID, noDraft;
    QString csTableName, fldCSID, fldCSKey, fldCSDesc, fldMerakezID;

    bool accountJoin() const { return csTableId == 1 || csTableId == 2; }
    bool consolidated() const { return accountJoin() && !fldMerakezID.trimmed().isEmpty(); }
};

// The document types to import, in the stored query's order: those included
// with or without their drafts.
QVector<DocTypeRecipe> ReadDocTypes(const Database& tempDocs, DbError* error);
// A recipe from the columns of a qDocTypes row, found by name.
DocTypeRecipe DocTypeRecipeFrom(const std::function<QVariant(const QString&)>& value);

// The selection of the documents last read and of the items on them; the item
// readers append the second when they read by documents.
struct DocCriteriaState {
    ErpQuery currentDocCriteria;
    ErpQuery currentItemByDocCriteria;
};

// The factor of the quantities: the text's value when it is a number, else 1.
double QtyFactorOf(const QString& text);

// The LIKE wildcard of the server behind a connection: servers that speak SQL
// (SQLite, PostgreSQL, SQL Server) know only "%", whatever the connection
// type says; any other takes the connection type's own.
QString LikeWildcardFor(const ErpConnection& erp);

// The WHERE fragment that selects a type's documents in its header table;
// numbers, dates and the start ID go in as values. The upper date bound takes
// the whole day. fromDocNum and toDocNum carry the prefix already (empty: no bound).
ErpQuery BuildDocRangeCriteria(const DocTypeRecipe& rsDT, const QVariant& fromDate, const QVariant& toDate,
                               const QString& fromDocNum, const QString& toDocNum, qint64 indx, bool includeDraft,
                               const QString& likeWildcard, short connType);
// The restriction of an item query to the items on the documents criteria selects.
// Criteria as plain SQL text, their values written in as the ERP's literals
// (texts between apostrophes, each doubled; dates by the connection type),
// for a host that asks for the text. The import itself sends the values
// bound, never in this form.
QString CriteriaText(const ErpQuery& criteria, short connType);

ErpQuery BuildItemByDocCriteria(const QString& headTable, const QString& lineTable, const QString& fldID,
                                const ErpQuery& docCriteria);

// The queries a type's import sends, composed from its recipe.
ErpQuery docCountSql(const DocTypeRecipe& rsDT, const ErpQuery& criteria);
ErpQuery docHeaderSql(const DocTypeRecipe& rsDT, int qtyRule, const ErpQuery& criteria);
ErpQuery docLineSql(const DocTypeRecipe& rsDT, int qtyRule, qint64 headerId);
ErpQuery docPackageSql(const DocTypeRecipe& rsDT, qint64 headerId);

// Imports one type's documents into the temporary documents database at
// dbPath: headers in ID order, their lines and, with the package rule, their
// package counts, all in one transaction. Returns the highest document ID
// read (the type's start index when the header query gave no row), -1 when
// no document matches, 0 after a failure (error set; nothing of the type is
// kept and its range row stays). state receives the criteria of the type.
qint64 ReadStockPriority(const ErpReadContext& ctx, const QString& dbPath, const DocTypeRecipe& rsDT,
                         const QVariant& fromDate, const QVariant& toDate, bool draftDocs,
                         const DocImportOptions& options, DocCriteriaState* state, ReadError* error);

// Fills the alternate numbers of the imported lines: the document's own
// account's first, then the labelled account's for what is left.
bool UpdateDocsAlterKeys(const QString& tempDocsPath, QString* error);

// Called after each type was read (result as ReadStockPriority's, never 0),
// when the items of the documents are to be read too: false ends the run.
using DocItemsStep = std::function<bool(const DocTypeRecipe& type, const DocCriteriaState& state)>;

struct DocImportResult {
    bool completed = false;        // every step ran; the selection may open
    QVector<ReadError> errors;     // to show, in order
    QString tempDocsPath;
    QString tempItemsPath;         // when the items were to be read
};

// The whole run: a new temporary documents database, every included type,
// the related items (through itemsStep, when options ask for them), the
// alternate numbers. A type that fails is reported, keeps nothing, and ends
// the run; a type without documents does not.
DocImportResult ImportDocuments(const ErpReadContext& ctx, const DocImportOptions& options, DocCriteriaState* state,
                                const DocItemsStep& itemsStep = {});

} // namespace tagora
