#pragma once

#include "labels/labelbridge.h"

#include <QString>
#include <memory>

namespace tagora {

class SettingsStore;

// The settings of the label outputs on Linux, section "Automation":
//   Bridge=glabels|zpl            for all four programs
//   NiceLabel.Application=zpl     for one program (LPPX.Application,
//                                 BarTender.Application, FastLabel.FastLabelX)
//   ZplHost=host:port             raw ZPL over a socket instead of the queue
//   Timeout=60                    seconds for each outside step
//   JournalFile=PATH              the journal, for programs without a bridge
inline const QString kAutomationSection = QStringLiteral("Automation");
inline const QString kJournalKey = QStringLiteral("JournalFile");

// The bridge the settings name for a program: its own key, else "Bridge";
// lower case, empty for none.
QString ChosenBridge(const SettingsStore& settings, const QString& progId);
// Whether a bridge of that name exists ("glabels", "zpl").
bool IsKnownBridge(const QString& name);
// The options from the settings, with the printer and the job folder given.
BridgeOptions BridgeOptionsFrom(const SettingsStore& settings, const QString& printer, const QString& jobFolder);
// The provider of the named bridge; null for an unknown name.
std::shared_ptr<AutomationProvider> MakeBridgeProvider(const QString& name, const BridgeOptions& options);

} // namespace tagora
