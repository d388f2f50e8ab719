#pragma once

#include <QString>
#include <optional>

class QObject;

namespace tagora {

// Which property of a control a stored text is bound to. The numbers are the
// ones stored in the settings tables and passed by hosts.
enum class BindKind : int { Text = 1, ListIndex = 2, Value = 3, Caption = 5 };

bool isBindKind(int kind);

// The property's value as the settings store keeps it: the text as typed, the
// list position in decimal, "0"/"1"/"2" for a check box, "True"/"False" for an
// option button, the caption. Nothing when the control has no such property.
std::optional<QString> readBound(const QObject* control, BindKind kind);

// Assigns a stored text to the property the way the control would convert it.
// Returns false, leaving the control as it was, when the control refuses the
// text (a list position beyond the list, "abc" for a check box, a text that a
// fixed list does not hold).
bool writeBound(QObject* control, BindKind kind, const QString& text);

// True when the control is a fixed list with nothing chosen and the stored
// text names what the list does not hold now: a printer not installed here, a
// position beyond a list filled from outside that is empty or shorter today.
// Saving "nothing chosen" over such a text would lose it.
bool listLacksStored(const QObject* control, BindKind kind, const QString& stored);

// The kind a control is naturally addressed by when no settings row says
// otherwise (text boxes by text, lists and tabs by position, check and option
// buttons by value, labels by caption).
std::optional<BindKind> naturalKind(const QObject* control);

// Option buttons of one group can all be clear, as stored settings may say;
// Qt's exclusive radio buttons refuse that unless asked this way.
void setOptionValue(QObject* optionButton, bool on);

// Truth of a stored text the way the settings were written: "True"/"False" in
// any case, or a number (non-zero is true). Nothing for any other text.
std::optional<bool> parseTruth(const QString& text);

} // namespace tagora
