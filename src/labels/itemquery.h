#pragma once

#include "labels/labelfields.h"

#include <QString>
#include <array>

namespace tagora {

// What the label-data query depends on, as read from the screen at the
// moment it is built.
struct LabelQuerySettings {
    std::array<bool, LabelFieldCount> sent{};           // ChkFldSend(i) ticked
    std::array<QString, LabelFieldCount> expressions{}; // txtFldExpr(i) for the expression rows
    bool useAccountKey = false;                         // ChkUseAccountKey ticked
    QString accountKey;                                 // txtAccountKey as typed
    QString companyName;                                // txtCompanyName
    QString itemRangeCriteria;                          // " And ItemKey >= '...'" ...
};

// Query types and sort directions as callers pass them.
enum : int { QueryByItems = 1, QueryByDocuments = 2 };
enum : int { OrderAscending = 1, OrderDescending = 2 };

// Whether a row of the label field table is sent: ticked, and for an
// expression row only with an expression, since a blank one has no column in
// the record. Whatever sends fields follows the query in this.
bool RowIsSent(const LabelQuerySettings& settings, int row);

// The SQL of the label-data record, in SQLite's words: the fixed item
// columns, the columns of the query type, then one column per sent row,
// with placeholder texts where the query type has no data. Account keys and
// range bounds are placed with apostrophes doubled; user expressions go in as
// SQL of their own, with double quotes taken as apostrophes.
QString BuildItemQuery(const LabelQuerySettings& settings, int queryType, int orderBy);

// Why the label-data query cannot be built from these settings, naming the
// expression row, or empty text. An expression is part of one statement: a
// ';' that would end it (one outside a literal; 'a;b' is text) is refused,
// the same for printing through a label program and for direct labels.
QString CheckItemQuery(const LabelQuerySettings& settings);

// " And ItemKey >= '...'" and so on for the non-empty trimmed bounds, with
// unqualified column names so the single-table dialog queries can use it too.
QString ItemRangeCriteria(const QString& fromItem, const QString& toItem, const QString& fromSort,
                          const QString& toSort);

} // namespace tagora
