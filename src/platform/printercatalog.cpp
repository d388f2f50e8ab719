#include "platform/printercatalog.h"

#include "platform/settingsstore.h"

#include <cups/cups.h>

namespace tagora {

namespace {
QString destName(const cups_dest_t& d)
{
    QString name = QString::fromUtf8(d.name);
    if (d.instance)
        name += QLatin1Char('/') + QString::fromUtf8(d.instance);
    return name;
}
} // namespace

std::shared_ptr<PrinterCatalog> systemPrinterCatalog()
{
    return std::make_shared<CupsPrinterCatalog>();
}

QStringList CupsPrinterCatalog::printerNames() const
{
    cups_dest_t* dests = nullptr;
    const int n = cupsGetDests2(CUPS_HTTP_DEFAULT, &dests);
    QStringList names;
    for (int i = 0; i < n; ++i)
        names << destName(dests[i]);
    cupsFreeDests(n, dests);
    return names;
}

bool SetDefaultPrinter(const QString& printer, QString* error)
{
    cups_dest_t* dests = nullptr;
    const int n = cupsGetDests2(CUPS_HTTP_DEFAULT, &dests);
    bool found = false;
    for (int i = 0; i < n; ++i) {
        const bool match = destName(dests[i]) == printer;
        dests[i].is_default = match ? 1 : 0;
        found = found || match;
    }
    bool ok = found;
    if (!found)
        *error = QStringLiteral("המדפסת '%1' אינה מוכרת במחשב זה").arg(printer);
    else if (cupsSetDests2(CUPS_HTTP_DEFAULT, n, dests) != 0) {
        *error = QStringLiteral("לא ניתן לקבוע את המדפסת '%1' כברירת מחדל: %2")
                     .arg(printer, QString::fromUtf8(cupsLastErrorString()));
        ok = false;
    }
    cupsFreeDests(n, dests);
    return ok;
}

void SetBrowserPrinter(const QString& printer, SettingsStore& store)
{
    const QString section = QStringLiteral("PageSetup");
    const QString key = QStringLiteral("printer");
    if (store.value(kSettingsApp, section, key).value_or(QString()) != printer) {
        store.setValue(kSettingsApp, section, key, printer);
        store.flush();
    }
}

} // namespace tagora

namespace tagora {

bool PrintFileOnCups(const QString&, const QString&, bool, const QString&, int, QString* error)
{
    *error = QStringLiteral("not yet");
    return false;
}

} // namespace tagora
