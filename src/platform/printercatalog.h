#pragma once

#include <QStringList>
#include <memory>

namespace tagora {

class SettingsStore;

// The printers installed on this machine, by device name, in the platform's order.
class PrinterCatalog {
public:
    virtual ~PrinterCatalog() = default;
    virtual QStringList printerNames() const = 0;
};

// A fixed list, for hosts that manage printers themselves and for tests.
class FixedPrinterCatalog : public PrinterCatalog {
public:
    explicit FixedPrinterCatalog(QStringList names = {}) : m_names(std::move(names)) {}
    QStringList printerNames() const override { return m_names; }

private:
    QStringList m_names;
};

// The catalog a control uses when its host names none.
std::shared_ptr<PrinterCatalog> systemPrinterCatalog();

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
