#include "platform/printercatalog.h"

#include "platform/settingsstore.h"

#include <QDeadlineTimer>
#include <QDir>
#include <QFile>
#include <QFileInfo>

#include <algorithm>
#include <climits>

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

namespace {
// One deadline for the whole submission: libcups asks again after each idle
// second, and the answer is "give up" once the time is spent, however the
// server dribbles its replies.
int keepWaiting(http_t*, void* deadline)
{
    return static_cast<QDeadlineTimer*>(deadline)->hasExpired() ? 0 : 1;
}

// The job's id, or 0 with cupsLastErrorString() telling why.
int printJob(http_t* http, const QByteArray& queue, const QString& path, bool raw, const QString& title)
{
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly))
        return 0;
    ipp_t* request = ippNewRequest(IPP_OP_PRINT_JOB);
    char uri[HTTP_MAX_URI];
    httpAssembleURIf(HTTP_URI_CODING_ALL, uri, sizeof uri, "ipp", nullptr, "localhost", ippPort(), "/printers/%s",
                     queue.constData());
    ippAddString(request, IPP_TAG_OPERATION, IPP_TAG_URI, "printer-uri", nullptr, uri);
    ippAddString(request, IPP_TAG_OPERATION, IPP_TAG_NAME, "requesting-user-name", nullptr, cupsUser());
    ippAddString(request, IPP_TAG_OPERATION, IPP_TAG_NAME, "job-name", nullptr, title.toUtf8().constData());
    // Raw bytes go to the printer untouched; anything else is typed by CUPS.
    ippAddString(request, IPP_TAG_OPERATION, IPP_TAG_MIMETYPE, "document-format", nullptr,
                 raw ? CUPS_FORMAT_RAW : CUPS_FORMAT_AUTO);
    const QByteArray resource = "/printers/" + queue;
    // The length is the whole body: the request and the document after it.
    http_status_t status = cupsSendRequest(http, request, resource.constData(), ippLength(request) + size_t(file.size()));
    while (status == HTTP_STATUS_CONTINUE && !file.atEnd()) {
        const QByteArray chunk = file.read(65536);
        if (chunk.isEmpty())
            break;
        status = cupsWriteRequestData(http, chunk.constData(), size_t(chunk.size()));
    }
    ipp_t* response = cupsGetResponse(http, resource.constData());
    int job = 0;
    if (response && cupsLastError() <= IPP_STATUS_OK_CONFLICTING) {
        if (ipp_attribute_t* id = ippFindAttribute(response, "job-id", IPP_TAG_INTEGER))
            job = ippGetInteger(id, 0);
    }
    ippDelete(response);
    ippDelete(request);
    return job;
}
} // namespace

bool PrintFileOnCups(const QString& printer, const QString& path, bool raw, const QString& title,
                     int timeoutSeconds, QString* error)
{
    if (!QFileInfo(path).isFile() || !QFileInfo(path).isReadable()) {
        *error = QStringLiteral("הקובץ '%1' להדפסה אינו קיים או אינו קריא").arg(QDir::toNativeSeparators(path));
        return false;
    }
    // A destination instance ("queue/instance") is printed on its queue.
    const QByteArray queue = printer.section(QLatin1Char('/'), 0, 0).toUtf8();
    if (queue.isEmpty()) {
        *error = QStringLiteral("לא נבחרה מדפסת");
        return false;
    }
    QDeadlineTimer deadline(std::chrono::seconds(std::max(1, timeoutSeconds)));
    const char* host = cupsServer(); // CUPS_SERVER, the client settings, or the local socket
    const QString server = host[0] == '/' ? QStringLiteral("CUPS") : QStringLiteral("%1:%2").arg(QString::fromUtf8(host)).arg(ippPort());
    http_t* http = httpConnect2(host, ippPort(), nullptr, AF_UNSPEC, cupsEncryption(), 1,
                                int(std::min<qint64>(deadline.remainingTime(), INT_MAX)), nullptr);
    if (!http) {
        *error = QStringLiteral("שרת ההדפסה %1 אינו זמין, והעבודה למדפסת %2 לא נשלחה").arg(server, printer);
        return false;
    }
    httpSetTimeout(http, 1.0, keepWaiting, &deadline);
    // One Print-Job request on this connection only: cupsPrintFile2 asks
    // the default connection for more when a step fails, and that one has
    // none of our deadline.
    const int job = printJob(http, queue, path, raw, title);
    const QString reason = QString::fromUtf8(cupsLastErrorString());
    httpClose(http);
    if (job > 0)
        return true;
    if (deadline.hasExpired())
        *error = QStringLiteral("שרת ההדפסה %1 לא ענה בתוך %2 שניות, והעבודה למדפסת %3 לא הודפסה")
                     .arg(server).arg(timeoutSeconds).arg(printer);
    else
        *error = QStringLiteral("המדפסת %1 דחתה את העבודה: %2").arg(printer, reason);
    return false;
}

} // namespace tagora
