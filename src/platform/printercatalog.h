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

// Sends a file to a CUPS printer as one job: a PDF to be printed, or with raw
// the bytes as they are (a thermal printer's own language). The server is the
// user's CUPS, or the one CUPS_SERVER names. True once CUPS has taken the job;
// false with CUPS's reason when the printer does not exist or refuses jobs,
// or when the server does not answer within timeoutSeconds.
bool PrintFileOnCups(const QString& printer, const QString& path, bool raw, const QString& title,
                     int timeoutSeconds, QString* error);

// The printer the browser's page setup should print on, kept in the settings
// (section "PageSetup", key "printer"); written only when it differs.
void SetBrowserPrinter(const QString& printer, SettingsStore& store);

} // namespace tagora
