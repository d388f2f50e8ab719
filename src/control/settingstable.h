#pragma once

#include "platform/controlbinding.h"
#include "platform/settingsstore.h"

#include <QString>
#include <optional>
#include <vector>

namespace tagora {

// One stored setting: the key, the control it is bound to, how, and the text a
// load gives when the key is missing.
struct SettingRow {
    QString key;
    QString control; // objectName on the main control
    int kind;        // BindKind as a number (rows may carry any number; only 1, 2, 3, 5 act)
    QString defaultText;
};

struct SettingSection {
    int number;      // 1..7, as hosts pass it
    QString name;    // section name in the store
    QString saveButton;
};

// The seven sections in number order.
const std::vector<SettingSection>& settingSections();
const SettingSection* settingSection(int number);

// The rows of one section in processing order. The label-variable section
// needs each row's field kind, which the table of label fields gives.
std::vector<SettingRow> settingRows(int section);

// The kind a control is stored by, when a settings row binds it.
std::optional<int> boundKind(const QString& controlName);

// The kind a control is addressed by from outside: its settings row's kind,
// else the control's natural one.
std::optional<BindKind> addressKind(const QObject* control);

// The order in which the sections load when the control is shown.
const std::vector<int>& showLoadOrder();

} // namespace tagora
