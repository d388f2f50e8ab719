#pragma once

#include <QString>
#include <QVariant>
#include <QVector>

namespace tagora {

class ProgressSink;

// One column of the item list: a sent row of the label field table.
struct ItemListColumn {
    QString caption; // heading: the row's description
    QString column;  // the record column shown
    QString kind;    // "2" price, "3" date, anything else text
};

// A value as the list shows it: a price by the price format, a date as
// dd/mm/yy, anything else as text; nothing is empty text.
QString ItemListCell(const QVariant& value, const QString& kind, const QString& priceFormat);

// Writes the list of the records of sql on dbPath: a row per record, a column
// per sent field and the copies last. Windows-1255 (characters it lacks as
// numeric references), CRLF, values escaped. The page is written aside and
// renamed into place. With no record the page ends after its body tag.
// Empty text on success.
QString CreateItemListPage(const QString& fileName, const QString& dbPath, const QString& sql,
                           const QVector<ItemListColumn>& columns, const QString& priceFormat,
                           ProgressSink* progress);

} // namespace tagora
