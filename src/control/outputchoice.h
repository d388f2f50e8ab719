#pragma once

#include <QString>

namespace tagora {

class SettingsStore;

// Where a run's labels go, from the "Automation" section of the settings:
//   Bridge       "glabels" or "zpl" for all four label programs
//   <ProgID>     the same for one program, over Bridge
//   ZplHost      "host:port": raw ZPL over a socket rather than the printer
//   Timeout      seconds for each outside step (60 when unset or not a count)
struct OutputSettings {
    QString bridge;       // lower case; empty: none
    QString zplHost;
    int timeoutSeconds = 60;
    bool journal = false; // JournalFile set: programs without a bridge write the journal
};

OutputSettings ReadOutputSettings(const SettingsStore& store, int programCode);

// The general tab's line naming the active output for a program code
// (5 NiceLabel, 2 CodeSoft, 4 BarTender, 7 FastLabel, 6 direct labels).
// printer: the one chosen, empty when none. Empty for no program.
QString OutputDescription(int programCode, const OutputSettings& settings, const QString& printer,
                          bool pageAutoPrint);

} // namespace tagora
