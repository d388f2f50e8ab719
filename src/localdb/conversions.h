#pragma once

#include <QDate>
#include <QString>
#include <QVariant>
#include <optional>

namespace tagora {

// "d/m/yy" as users type it: two-digit years from 80 are the 1900s, below 80
// the 2000s; days and months out of range roll over (31/02/05 is 3 March
// 2005). Nothing when the text has not two separators or a part is not a number.
std::optional<QDate> ParseDayMonthYear(const QString& text);

// A quantity as label copies: the nearest whole number (halves to even), its
// size; anything beyond ±999 prints 999.
short QuantityToCopies(double quantity);

QString NullToText(const QVariant& value, const QString& defaultText);

// A value safe to place between apostrophes in generated SQL and in label
// data: apostrophes, double quotes and commas removed.
QString StripQuoteChars(const QVariant& value);

} // namespace tagora
