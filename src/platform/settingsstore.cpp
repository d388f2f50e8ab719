#include "platform/settingsstore.h"

#include <QByteArrayView>
#include <QDateTime>
#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QSettings>
#include <QStandardPaths>
#include <QStringDecoder>
#include <QStringList>

namespace tagora {

namespace {
const QString kMainApp = QStringLiteral("Tagora");

// A list where one text was stored (a hand-made registry value); the setting
// was one text.
QString asText(const QVariant& v)
{
    if (v.metaType().id() == QMetaType::QStringList)
        return v.toStringList().join(QStringLiteral(", "));
    return v.toString();
}

// ---- One value of an INI file, read as typed.
//
// QSettings reads an unquoted value holding commas ("#,##0.00", "Acme, Ltd",
// typed by hand) as a list and drops the blanks around every comma, so the
// text cannot be put together again from the list. Such a value is read a
// second time from the file's own bytes, by the same rules Qt writes and reads
// INI text with (escapes, double quotes, comments, "\" in keys for "/",
// "%XX" for other characters), except that a comma is just a comma.

bool isBlank(char c)
{
    return c == ' ' || c == '\t';
}

int digitValue(char c, int base)
{
    const char lower = char(c | 0x20);
    const int d = c >= '0' && c <= '9' ? c - '0' : lower >= 'a' && lower <= 'f' ? lower - 'a' + 10 : -1;
    return d < base ? d : -1;
}

QString unescapedKey(QByteArrayView key)
{
    QString out;
    for (qsizetype i = 0; i < key.size(); ++i) {
        const char c = key[i];
        if (c == '\\') {
            out += QLatin1Char('/');
            continue;
        }
        if (c == '%' && i + 2 < key.size()) {
            const bool wide = key[i + 1] == 'U';
            const qsizetype digits = wide ? 4 : 2;
            const qsizetype first = i + 1 + (wide ? 1 : 0);
            bool ok = false;
            const uint code = first + digits <= key.size() ? key.sliced(first, digits).toUInt(&ok, 16) : 0;
            if (ok) {
                out += QChar(char16_t(code));
                i = first + digits - 1;
                continue;
            }
        }
        out += QString::fromUtf8(key.sliced(i, 1));
    }
    return out;
}

// The text of one value: escapes decoded, quotes dropped, commas kept.
QString unescapedValue(QByteArrayView v)
{
    static const char codes[][2] = {{'a', '\a'}, {'b', '\b'}, {'f', '\f'}, {'n', '\n'},  {'r', '\r'}, {'t', '\t'},
                                    {'v', '\v'}, {'"', '"'},   {'?', '?'},   {'\'', '\''}, {'\\', '\\'}};
    QString out;
    QByteArray run; // plain bytes, decoded together so UTF-8 stays whole
    auto flush = [&] {
        out += QString::fromUtf8(run);
        run.clear();
    };
    bool quoted = false;
    qsizetype i = 0;
    while (i < v.size() && isBlank(v[i]))
        ++i;
    while (i < v.size()) {
        const char c = v[i++];
        if (c == '"') {
            quoted = true;
            continue;
        }
        if (c != '\\') {
            run += c;
            continue;
        }
        if (i >= v.size())
            break;
        flush();
        const char e = v[i++];
        bool known = false;
        for (const auto& [code, ch] : codes)
            if (e == code) {
                out += QLatin1Char(ch);
                known = true;
            }
        if (known)
            continue;
        if (e == 'x' || (e >= '0' && e <= '7')) {
            const int base = e == 'x' ? 16 : 8;
            uint code = e == 'x' ? 0 : uint(e - '0');
            int count = e == 'x' ? 0 : 1;
            for (int d; i < v.size() && (d = digitValue(v[i], base)) >= 0; ++i, ++count)
                code = code * uint(base) + uint(d);
            if (count > 0)
                out += QChar(char16_t(code));
        } else if ((e == '\n' || e == '\r') && i < v.size() && (v[i] == '\n' || v[i] == '\r') && v[i] != e) {
            ++i; // a continued line ends in either order of CR and LF
        }
    }
    flush();
    // Blanks at the end belong to the text only when it was quoted.
    if (!quoted)
        while (!out.isEmpty() && (out.back() == QLatin1Char(' ') || out.back() == QLatin1Char('\t')))
            out.chop(1);
    if (out.startsWith(QLatin1String("@@")))
        out.remove(0, 1);
    return out;
}

// The next logical line from pos: a quoted value may run over line ends, a
// backslash keeps the character after it, and a ";" outside quotes starts a
// comment. Returns false at the end of the data.
bool nextIniLine(QByteArrayView data, qsizetype& pos, QByteArrayView& line, qsizetype& equals)
{
    while (pos < data.size() && (isBlank(data[pos]) || data[pos] == '\n' || data[pos] == '\r'))
        ++pos;
    if (pos >= data.size())
        return false;
    const qsizetype start = pos;
    equals = -1;
    bool inQuotes = false;
    qsizetype end = data.size();
    for (qsizetype i = start; i < data.size(); ++i) {
        const char c = data[i];
        if (c == '"') {
            inQuotes = !inQuotes;
        } else if (c == '\\') {
            ++i;
            if (i + 1 < data.size() && (data[i] == '\n' || data[i] == '\r') && (data[i + 1] == '\n' || data[i + 1] == '\r')
                && data[i + 1] != data[i])
                ++i;
        } else if (c == '=' && !inQuotes && equals < 0) {
            equals = i - start;
        } else if ((c == '\n' || c == '\r') && !inQuotes) {
            end = i;
            break;
        } else if (c == ';' && !inQuotes) {
            end = i;
            break;
        }
    }
    line = data.sliced(start, end - start);
    pos = end;
    // What follows a ";" is a comment up to the line's end.
    if (pos < data.size() && data[pos] == ';')
        while (pos < data.size() && data[pos] != '\n' && data[pos] != '\r')
            ++pos;
    return true;
}

// The value of the key ("Section/Key", or "Key" for the file's general
// section) as typed in the file; nothing when the file lacks it.
std::optional<QString> typedIniValue(const QString& path, const QString& wanted)
{
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly))
        return std::nullopt;
    const QByteArray bytes = file.readAll();
    QByteArrayView data(bytes);
    if (data.startsWith("\xef\xbb\xbf"))
        data = data.sliced(3);
    QString section;
    std::optional<QString> found;
    std::optional<QString> foundAnyCase;
    qsizetype pos = 0;
    QByteArrayView line;
    qsizetype equals = -1;
    while (nextIniLine(data, pos, line, equals)) {
        if (line.startsWith('[')) {
            qsizetype close = line.indexOf(']');
            const QByteArrayView name = line.sliced(1, (close < 0 ? line.size() : close) - 1).trimmed();
            if (name.compare("general", Qt::CaseInsensitive) == 0)
                section.clear();
            else if (name.compare("%general", Qt::CaseInsensitive) == 0)
                section = QString::fromLatin1(name.sliced(1)) + QLatin1Char('/');
            else
                section = unescapedKey(name) + QLatin1Char('/');
            continue;
        }
        if (equals < 0)
            continue;
        const QString key = section + unescapedKey(line.first(equals).trimmed());
        // As QSettings does, the last of repeated keys counts.
        if (key == wanted)
            found = unescapedValue(line.sliced(equals + 1));
        else if (key.compare(wanted, Qt::CaseInsensitive) == 0)
            foundAnyCase = unescapedValue(line.sliced(equals + 1));
    }
    return found ? found : foundAnyCase;
}

// Why a settings file must not be rewritten: it is not the UTF-8 text this
// store writes. QSettings reads other bytes as replacement characters and
// would save those in their place. Empty text for a file that may be
// rewritten, or for none.
QString foreignFile(const QString& path)
{
    if (!QFileInfo::exists(path))
        return QString();
    const QString shown = QDir::toNativeSeparators(QFileInfo(path).absoluteFilePath());
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly))
        return QStringLiteral("לא ניתן לקרוא את קובץ ההגדרות '%1'").arg(shown);
    const QByteArray bytes = file.readAll();
    if (bytes.contains('\0'))
        return QStringLiteral("קובץ ההגדרות '%1' אינו קובץ טקסט (יש בו תווים בינאריים); הוא לא ישוכתב כדי שתוכנו "
                              "לא יאבד")
            .arg(shown);
    QStringDecoder utf8(QStringDecoder::Utf8, QStringDecoder::Flag::Stateless);
    const QString text = utf8.decode(bytes);
    if (utf8.hasError())
        return QStringLiteral("קובץ ההגדרות '%1' אינו כתוב בקידוד UTF-8 (ייתכן שנשמר בקידוד Windows-1255); הוא לא "
                              "ישוכתב כדי שתוכנו לא יאבד. יש לשמור אותו מחדש בקידוד UTF-8")
            .arg(shown);
    return QString();
}
} // namespace

IniSettingsStore::IniSettingsStore(const QString& path)
    : m_path(path)
{
    const QFileInfo info(path);
    if (!info.dir().exists())
        QDir().mkpath(info.absolutePath());
    m_refusal = foreignFile(path);
    m_settings = std::make_unique<QSettings>(path, QSettings::IniFormat);
    if (m_refusal.isEmpty() && info.exists() && m_settings->status() != QSettings::NoError)
        m_refusal = QStringLiteral("קובץ ההגדרות '%1' אינו קובץ הגדרות תקין; הוא לא ישוכתב כדי שתוכנו לא יאבד")
                        .arg(QDir::toNativeSeparators(info.absoluteFilePath()));
    m_unreadable = !m_refusal.isEmpty();
    m_checked = info.exists() ? std::make_pair(info.lastModified(), info.size()) : std::make_pair(QDateTime(), qint64(-1));
}

bool IniSettingsStore::stillOurs()
{
    if (m_unreadable)
        return false;
    // Another program may have saved the file since it was read; QSettings
    // merges that file into what it writes, so it is judged again.
    const QFileInfo info(m_path);
    const auto now = info.exists() ? std::make_pair(info.lastModified(), info.size()) : std::make_pair(QDateTime(), qint64(-1));
    if (now == m_checked)
        return true;
    m_checked = now;
    m_refusal = foreignFile(m_path);
    m_unreadable = !m_refusal.isEmpty();
    return !m_unreadable;
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
    const QVariant v = m_settings->value(k);
    // Only a value read from the file comes back as a list: what this store
    // writes is always one text.
    if (v.metaType().id() == QMetaType::QStringList)
        if (const auto typed = typedIniValue(m_path, k))
            return typed;
    return asText(v);
}

bool IniSettingsStore::setValue(const QString& app, const QString& section, const QString& key, const QString& text)
{
    if (!stillOurs())
        return false;
    m_settings->setValue(groupKey(app, section, key), text);
    return true;
}

bool IniSettingsStore::flush()
{
    if (!stillOurs())
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
