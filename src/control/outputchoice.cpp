#include "control/outputchoice.h"

#include "labels/bridges.h"
#include "labels/labelprograms.h"
#include "platform/settingsstore.h"

namespace tagora {

namespace {
const QString kArrow = QStringLiteral("\u200F←\u200F");
} // namespace

// Read as the run reads them, so the line never names another output.
OutputSettings ReadOutputSettings(const SettingsStore& store, int programCode)
{
    OutputSettings s;
    const QString progId = LabelProgram::progId(programCode);
    s.bridge = progId.isEmpty() ? QString() : ChosenBridge(store, progId);
    const BridgeOptions options = BridgeOptionsFrom(store, QString(), QString());
    s.zplHost = options.zplHost;
    s.timeoutSeconds = options.timeoutSeconds;
    s.journal = !store.value(kSettingsApp, kAutomationSection, kJournalKey).value_or(QString()).trimmed().isEmpty();
    return s;
}

QString OutputDescription(int programCode, const OutputSettings& settings, const QString& printer,
                          bool pageAutoPrint)
{
    if (programCode == 6) {
        if (pageAutoPrint && !printer.isEmpty())
            return QStringLiteral("פלט: PDF ישירות למדפסת %1").arg(printer);
        return QStringLiteral("פלט: דפדפן");
    }
    if (LabelProgram::progId(programCode).isEmpty())
        return {};
    // The screen reads right to left: the arrow points from the bridge on the
    // right to where its labels go on the left. Marks hold it in the right-
    // to-left run, or between two Latin names ("ZPL", a host) it would join
    // their left-to-right run and point back at the bridge.
    const QString target = printer.isEmpty() ? QStringLiteral("קובץ PDF בתיקיית העבודה")
                                             : QStringLiteral("מדפסת %1").arg(printer);
    if (settings.bridge == QLatin1String("glabels"))
        return QStringLiteral("פלט: gLabels %1 %2").arg(kArrow, target);
    if (settings.bridge == QLatin1String("zpl")) {
        if (!settings.zplHost.isEmpty())
            return QStringLiteral("פלט: ZPL %1 %2").arg(kArrow, settings.zplHost);
        if (printer.isEmpty())
            return QStringLiteral("פלט: ZPL %1 קובץ בתיקיית העבודה").arg(kArrow);
        return QStringLiteral("פלט: ZPL %1 מדפסת %2").arg(kArrow, printer);
    }
    // A bridge name we do not know fails the run rather than print elsewhere; the line says so.
    if (!settings.bridge.isEmpty())
        return QStringLiteral("פלט: הגשר '%1' אינו מוכר, ההדפסה תיכשל").arg(settings.bridge);
    if (settings.journal)
        return QStringLiteral("פלט: יומן (journal)");
    return QStringLiteral("פלט: לא הוגדר גשר הדפסה");
}

} // namespace tagora
