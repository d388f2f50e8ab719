#pragma once

#include "control/printercatalog.h"

#include <QString>

namespace tagora {

class SettingsStore;

// The printers CUPS knows for this user (destinations, with instances as
// "name/instance"), in its order.
class CupsPrinterCatalog : public PrinterCatalog {
public:
    QStringList printerNames() const override;
};

// Makes the printer the user's default CUPS destination. False with a
// description when there is no such printer or the choice cannot be kept.
bool SetDefaultPrinter(const QString& printer, QString* error);

// The printer the browser's page setup should print on, kept in the settings
// (section "PageSetup", key "printer"); written only when it differs.
void SetBrowserPrinter(const QString& printer, SettingsStore& store);

} // namespace tagora
