#pragma once

#include <QDate>
#include <QString>
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
};

// A reader's failure: the title names the row being read when it failed.
struct ReadError {
    QString title;
    QString message;
};

// The readers: each opens its own ERP connection and local database, walks
// its query forward-only, reports progress every fifth row, writes in one
// transaction with prepared statements, and closes everything before it
// returns. A duplicate key in the local table skips that row; any other error
// stops the reader (rows written before it stay) and returns false.
bool ReadItemPriority(const ErpReadContext& ctx, const QString& dbPath, const QString& fromSort,
                      const QString& toSort, bool foreignNames, short copies, int priceList, bool byDocs,
                      bool withWarehouse, ReadError* error);
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

// Merges the staging rows of the temporary items database into the main tables.
bool UpdateMainItemTables(const QString& tempItemsPath, QString* error);

// The price lists offered as the source of the item price.
struct PriceField {
    QString text;
    int priceList = 0;
};
QVector<PriceField> ReadPriceFields(const QString& connString, QString* error);

// The SQL texts the readers send (range bounds and criteria included).
QString itemQuerySql(const QString& fromSort, const QString& toSort, bool foreignNames, int priceList,
                     bool withWarehouse, const QString& docCriteria);
QString foreignNameQuerySql(const QString& fromSort, const QString& toSort, const QString& docCriteria);
QString alterKeyQuerySql(bool suppliers, const QString& docCriteria);
QString alterPriceQuerySql(const QString& todayLiteral, const QString& docCriteria);
QString priceListQuerySql(const QString& fromSort, const QString& toSort, const QString& docCriteria);
QString familyRangeSql(const QString& fromSort, const QString& toSort);

} // namespace tagora
