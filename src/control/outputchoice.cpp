#include "control/outputchoice.h"

#include "labels/labelprograms.h"
#include "platform/settingsstore.h"

namespace tagora {

namespace {
const QString kArrow = QStringLiteral("\u200F←\u200F");
const QString kSection = QStringLiteral("Automation");

QString read(const SettingsStore& store, const QString& key)
{
    return store.value(kSettingsApp, kSection, key).value_or(QString()).trimmed();
}
} // namespace

OutputSettings ReadOutputSettings(const SettingsStore& store, int programCode)
{
    OutputSettings s;
    const QString progId = LabelProgram::progId(programCode);
    QString bridge = progId.isEmpty() ? QString() : read(store, progId);
    if (bridge.isEmpty())
        bridge = read(store, QStringLiteral("Bridge"));
    s.bridge = bridge.toLower();
    s.zplHost = read(store, QStringLiteral("ZplHost"));
    bool ok = false;
    const int timeout = read(store, QStringLiteral("Timeout")).toInt(&ok);
    if (ok && timeout > 0)
        s.timeoutSeconds = timeout;
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
            return QStringLiteral("פלט: ZPL %1 לא נבחרה מדפסת").arg(kArrow);
        return QStringLiteral("פלט: ZPL %1 מדפסת %2").arg(kArrow, printer);
    }
    // A bridge name we do not know is shown, not silently taken for the journal.
    if (!settings.bridge.isEmpty())
        return QStringLiteral("פלט: יומן (journal); הגשר '%1' אינו מוכר").arg(settings.bridge);
    return QStringLiteral("פלט: יומן (journal)");
}

} // namespace tagora
