#include "platform/settingsstore.h"

#include <QDir>
#include <QFileInfo>
#include <QSettings>
#include <QStandardPaths>
#include <QStringList>

namespace tagora {

namespace {
const QString kMainApp = QStringLiteral("Tagora");

// QSettings hands back a list for an unquoted value with commas ("Foo, Ltd"
// typed by hand); the setting was one text, so join it back.
QString asText(const QVariant& v)
{
    if (v.metaType().id() == QMetaType::QStringList)
        return v.toStringList().join(QStringLiteral(", "));
    return v.toString();
}
} // namespace

IniSettingsStore::IniSettingsStore(const QString& path)
    : m_path(path)
{
    const QFileInfo info(path);
    if (!info.dir().exists())
        QDir().mkpath(info.absolutePath());
    m_settings = std::make_unique<QSettings>(path, QSettings::IniFormat);
    m_unreadable = info.exists() && m_settings->status() != QSettings::NoError;
}

IniSettingsStore::~IniSettingsStore()
{
    flush();
}

QString IniSettingsStore::groupKey(const QString& app, const QString& section, const QString& key) const
{
    if (app.compare(kMainApp, Qt::CaseInsensitive) == 0)
        return section + QLatin1Char('/') + key;
    return app + QLatin1Char('/') + section + QLatin1Char('/') + key;
}

std::optional<QString> IniSettingsStore::value(const QString& app, const QString& section, const QString& key) const
{
    const QString k = groupKey(app, section, key);
    if (!m_settings->contains(k))
        return std::nullopt;
    return asText(m_settings->value(k));
}

bool IniSettingsStore::setValue(const QString& app, const QString& section, const QString& key, const QString& text)
{
    if (m_unreadable)
        return false;
    m_settings->setValue(groupKey(app, section, key), text);
    return true;
}

bool IniSettingsStore::flush()
{
    if (m_unreadable)
        return false;
    m_settings->sync();
    return m_settings->status() == QSettings::NoError;
}

#ifdef Q_OS_WIN
namespace {
QString registryPath(const QString& app)
{
    return QStringLiteral("HKEY_CURRENT_USER\\Software\\VB and VBA Program Settings\\") + app;
}
} // namespace

std::optional<QString> RegistrySettingsStore::value(const QString& app, const QString& section, const QString& key) const
{
    QSettings reg(registryPath(app), QSettings::NativeFormat);
    const QString k = section + QLatin1Char('/') + key;
    if (!reg.contains(k))
        return std::nullopt;
    return asText(reg.value(k));
}

bool RegistrySettingsStore::setValue(const QString& app, const QString& section, const QString& key, const QString& text)
{
    QSettings reg(registryPath(app), QSettings::NativeFormat);
    reg.setValue(section + QLatin1Char('/') + key, text);
    reg.sync();
    return reg.status() == QSettings::NoError;
}
#endif

QString defaultSettingsPath()
{
    const QString env = qEnvironmentVariable("TAGORA_SETTINGS");
    if (!env.isEmpty())
        return env;
    return QStandardPaths::writableLocation(QStandardPaths::GenericConfigLocation)
        + QStringLiteral("/Tagora/Tagora.ini");
}

std::shared_ptr<SettingsStore> defaultSettingsStore()
{
#ifdef Q_OS_WIN
    if (qEnvironmentVariableIsEmpty("TAGORA_SETTINGS"))
        return std::make_shared<RegistrySettingsStore>();
#endif
    return std::make_shared<IniSettingsStore>(defaultSettingsPath());
}

} // namespace tagora
