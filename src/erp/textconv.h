#pragma once

#include <QDateTime>
#include <QString>
#include <QVariant>

namespace tagora {

// The character placed between the characters of a text in cell form
// (code 212 of Windows-1255), so the direct-label page can lay a Hebrew text
// out one table cell per character whatever the browser's direction rules.
inline constexpr QChar kCellSeparator = QChar(0x05F0);

// The ERP's text and dates depend on the connection type in use: type 1 sends
// Hebrew in visual order and dates as dates, type 2 logical text and dates as
// minutes since 1 January 1988. Type 0 (none chosen) reads like type 1.
short erpConnType();
void setErpConnType(short type);

// Text in visual (display) order to logical order: reversed, except that runs
// of digits and Latin letters (with joiners + - . / \ after a run's first
// character) keep their own order; brackets are mirrored. Unchanged for type 2.
QString VisualToLogical(const QString& text, short connType);
QString VisualToLogical(const QString& text);

// Cell form: every character (mirrored) between separators, last to first;
// for type 2 the result is turned back so the characters keep their order.
// A character is a code point: a surrogate pair stays whole and in order.
QString ReverseForCells(const QString& text, short connType);
QString ReverseForCells(const QString& text);
// The character as the cell form writes it: brackets and angle brackets turned
// around. Applying it twice gives the character back.
QChar MirrorChar(QChar c);

// Texts counted in characters (code points), not UTF-16 units, so a cut never
// splits an emoji or another character beyond the basic plane.
QString LeftChars(const QString& text, int count);
// UTF-16 units of the character at i (an index within the text): 2 for a surrogate pair.
qsizetype CharUnitsAt(const QString& text, qsizetype i);
int CharCount(const QString& text);

bool HasHebrewLetters(const QString& text);

QString ConvertErpText(const QVariant& value, const QString& defaultText);
QString ConvertErpLabelText(const QVariant& value, const QString& defaultText);
QString ErpTextOrNbsp(const QVariant& value);
QString NullToNbsp(const QVariant& value);
QString NullTrim(const QVariant& value);
double NullToDouble(const QVariant& value);
short NullToInteger(const QVariant& value);
QString QuoteToApostrophe(const QString& text);

// Dates as the ERP keeps them. Null in, null out.
QVariant ErpToDate(const QVariant& value, short connType);
QVariant ErpToDate(const QVariant& value);
QVariant DateToErp(const QVariant& value, short connType);
QVariant DateToErp(const QVariant& value);
// A date as SQL text for the ERP: minutes for type 2, #dd/mm/yyyy# otherwise.
QString DateToErpLiteral(const QVariant& value, short connType);
QString DateToErpLiteral(const QVariant& value);

// The day serial the ERP's dates count from: day 0 is 30 December 1899, so
// 1 January 1988 is 32143.
inline constexpr int kErpEpochSerial = 32143;
QDate serialToDate(long long serial);
double dateToSerial(const QDateTime& when);

} // namespace tagora
