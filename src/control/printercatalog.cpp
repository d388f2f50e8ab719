#include "control/printercatalog.h"

#include "labels/printers.h"

namespace tagora {

std::shared_ptr<PrinterCatalog> systemPrinterCatalog()
{
    return std::make_shared<CupsPrinterCatalog>();
}

} // namespace tagora
