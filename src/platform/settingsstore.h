#pragma once

#include <QDateTime>
#include <QString>
#include <memory>
#include <optional>
#include <utility>

class QSettings;

namespace tagora {

// The application every setting of the system is stored under.
inline const QString kSettingsApp = QStringLiteral("Tagora");

// The per-user key-value store behind every setting: application, section,
// key, text value. Nothing here knows about controls.
class SettingsStore {
public:
    virtual ~SettingsStore() = default;
    // The stored text, or nothing when the key (or its section) is missing.
    virtual std::optional<QString> value(const QString& app, const QString& section, const QString& key) const = 0;
    // False when the value could not be written.
    virtual bool setValue(const QString& app, const QString& section, const QString& key, const QString& text) = 0;
    // Push pending writes to the medium; false when that failed.
    virtual bool flush() { return true; }
    // Why the store takes no writes at all, in Hebrew; empty when it does.
    virtual QString refusal() const { return QString(); }
};

// An INI file: one group per section of the application "Tagora" (what an
// administrator prepares for many workstations), and "App/Section" groups for
// any other application name a host may use.
class IniSettingsStore : public SettingsStore {
public:
    explicit IniSettingsStore(const QString& path);
    ~IniSettingsStore() override;

    std::optional<QString> value(const QString& app, const QString& section, const QString& key) const override;
    bool setValue(const QString& app, const QString& section, const QString& key, const QString& text) override;
    bool flush() override;

    QString path() const { return m_path; }
    // True when the file exists but is not the UTF-8 INI text this store
    // writes (another code page, binary bytes, or text QSettings cannot
    // parse): such a file is never written back, as a save would replace
    // what it cannot read with replacement characters.
    bool unreadable() const { return m_unreadable; }
    QString refusal() const override { return m_refusal; }

private:
    QString groupKey(const QString& app, const QString& section, const QString& key) const;
    // False once the file is found not to be ours to rewrite.
    bool stillOurs();

    QString m_path;
    std::unique_ptr<QSettings> m_settings;
    bool m_unreadable = false;
    QString m_refusal;
    std::pair<QDateTime, qint64> m_checked; // the file as last judged: time and size

};

#ifdef Q_OS_WIN
// The registry, where the original screens kept their settings, so a user
// moving to this build keeps them.
class RegistrySettingsStore : public SettingsStore {
public:
    std::optional<QString> value(const QString& app, const QString& section, const QString& key) const override;
    bool setValue(const QString& app, const QString& section, const QString& key, const QString& text) override;
};
#endif

// The store a host gets when it names none: the file in $TAGORA_SETTINGS when
// that is set, otherwise the platform's per-user store.
std::shared_ptr<SettingsStore> defaultSettingsStore();
QString defaultSettingsPath();

} // namespace tagora
