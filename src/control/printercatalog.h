#pragma once

#include <QStringList>
#include <memory>

namespace tagora {

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

} // namespace tagora
