#pragma once

#include "erp/odbc.h"

#include <QDate>
#include <QString>
#include <QStringList>
#include <QVector>

namespace tagora {

class ProgressSink;

// What a reader needs besides its own arguments.
struct ErpReadContext {
    QString connString;
    ProgressSink* progress = nullptr;
    // The restriction to the items of the imported documents, used when a
    // reader runs by documents.
    QString itemByDocCriteria;
    QDate today = QDate::currentDate();
    // Seconds each reader's ERP operation may take; 0 keeps the reader's own.
    int timeout = 0;
    // The values of the "?" markers of itemByDocCriteria, in order.
    ErpParams itemByDocParams;
};

// A reader's failure: the title names the row being read when it failed.
struct ReadError {
    QString title;
    QString message;
};

// The readers: each opens its own ERP connection and local database and walks
// its query forward-only on the calling thread (which also reports progress
// every fifth row and asks whether to cancel), while a second thread converts
// the rows and writes them in one transaction with a prepared statement.
// A duplicate key in the local table skips that row. Any other error on
// either side, or a cancel, rolls the transaction back, so the local database
// is as it was before the reader began, and the reader returns false. With
// replaceAll the item reader empties tItems first, in that same transaction.
bool ReadItemPriority(const ErpReadContext& ctx, const QString& dbPath, const QString& fromSort,
                      const QString& toSort, bool foreignNames, short copies, int priceList, bool byDocs,
                      bool withWarehouse, ReadError* error, bool replaceAll = false);
bool ReadItemFName(const ErpReadContext& ctx, const QString& dbPath, const QString& fromSort, const QString& toSort,
                   bool byDocs, ReadError* error);
bool ReadAlterKeyPRIORITY(const ErpReadContext& ctx, const QString& dbPath, bool byDocs, const QString& table,
                          ReadError* error);
bool ReadAlterKeySupPRIORITY(const ErpReadContext& ctx, const QString& dbPath, bool byDocs, const QString& table,
                             ReadError* error);
bool ReadAlterPricePRIORITY(const ErpReadContext& ctx, const QString& dbPath, bool byDocs, const QString& table,
                            ReadError* error);
bool ReadPriceListPriority(const ErpReadContext& ctx, const QString& dbPath, const QString& fromSort,
                           const QString& toSort, bool byDocs, const QString& table, ReadError* error);
bool ReadPriceListNamePriority(const ErpReadContext& ctx, const QString& dbPath, ReadError* error);

// Merges the staging rows of the temporary items database into the main
// tables; the tables in emptyFirst (main tables reached through its links)
// are emptied in the same transaction, so they are replaced whole or not at all.
bool UpdateMainItemTables(const QString& tempItemsPath, QString* error, const QStringList& emptyFirst = {});

// The price lists offered as the source of the item price.
struct PriceField {
    QString text;
    int priceList = 0;
};
QVector<PriceField> ReadPriceFields(const QString& connString, QString* error);

// The queries the readers send: range bounds, the price-list number and the
// day go in as values, never as SQL text; the criteria of the documents'
// items are SQL of their own.
// docParams are the values of the criteria's own "?" markers.
ErpQuery itemQuerySql(const QString& fromSort, const QString& toSort, bool foreignNames, int priceList,
                      bool withWarehouse, const QString& docCriteria, const ErpParams& docParams = {});
ErpQuery foreignNameQuerySql(const QString& fromSort, const QString& toSort, const QString& docCriteria,
                             const ErpParams& docParams = {});
ErpQuery alterKeyQuerySql(bool suppliers, const QString& docCriteria, const ErpParams& docParams = {});
// today: the day as the ERP keeps it (DateToErp: a date, or minutes for connection type 2).
ErpQuery alterPriceQuerySql(const QVariant& today, const QString& docCriteria, const ErpParams& docParams = {});
ErpQuery priceListQuerySql(const QString& fromSort, const QString& toSort, const QString& docCriteria,
                           const ErpParams& docParams = {});
ErpQuery familyRangeSql(const QString& fromSort, const QString& toSort);

} // namespace tagora
