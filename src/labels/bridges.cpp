#include "labels/bridges.h"

#include "labels/glabelsbridge.h"
#include "labels/zplbridge.h"
#include "platform/settingsstore.h"

namespace tagora {

QString ChosenBridge(const SettingsStore& settings, const QString& progId)
{
    QString name = settings.value(kSettingsApp, kAutomationSection, progId).value_or(QString()).trimmed();
    if (name.isEmpty())
        name = settings.value(kSettingsApp, kAutomationSection, QStringLiteral("Bridge")).value_or(QString()).trimmed();
    return name.toLower();
}

bool IsKnownBridge(const QString& name)
{
    return name == QLatin1String("glabels") || name == QLatin1String("zpl");
}

BridgeOptions BridgeOptionsFrom(const SettingsStore& settings, const QString& printer, const QString& jobFolder)
{
    BridgeOptions o;
    o.printer = printer;
    o.jobFolder = jobFolder;
    o.zplHost = settings.value(kSettingsApp, kAutomationSection, QStringLiteral("ZplHost")).value_or(QString()).trimmed();
    bool ok = false;
    const int seconds
        = settings.value(kSettingsApp, kAutomationSection, QStringLiteral("Timeout")).value_or(QString()).toInt(&ok);
    if (ok && seconds > 0)
        o.timeoutSeconds = seconds;
    return o;
}

std::shared_ptr<AutomationProvider> MakeBridgeProvider(const QString& name, const BridgeOptions& options)
{
    if (name == QLatin1String("glabels"))
        return std::make_shared<BridgeProvider>(
            [options](const QString&) -> std::unique_ptr<LabelSink> { return std::make_unique<GlabelsSink>(options); });
    if (name == QLatin1String("zpl"))
        return std::make_shared<BridgeProvider>(
            [options](const QString&) -> std::unique_ptr<LabelSink> { return std::make_unique<ZplSink>(options); });
    return nullptr;
}

} // namespace tagora
