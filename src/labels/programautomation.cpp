#include "labels/programautomation.h"

#include <QDir>

#include <algorithm>

namespace tagora {

void AutomationRegistry::add(const QString& progId, std::shared_ptr<AutomationProvider> provider)
{
    m_providers[progId.toLower()] = std::move(provider);
}

void AutomationRegistry::setFallback(std::shared_ptr<AutomationProvider> provider)
{
    m_fallback = std::move(provider);
}

std::shared_ptr<AutomationObject> AutomationRegistry::create(const QString& progId, QString* error) const
{
    if (progId.isEmpty()) {
        *error = QStringLiteral("לא נבחרה תוכנת מדבקות");
        return nullptr;
    }
    const auto it = m_providers.find(progId.toLower());
    AutomationProvider* provider = it != m_providers.end() ? it->second.get() : m_fallback.get();
    if (!provider) {
        *error = QStringLiteral("לא ניתן ליצור את האובייקט %1: תוכנת המדבקות אינה זמינה במחשב זה "
                                "(אין לה ספק אוטומציה רשום, וקובץ יומן לא הוגדר)")
                     .arg(progId);
        return nullptr;
    }
    return provider->create(progId, error);
}

QString journalValue(const QVariant& value)
{
    if (!value.isValid() || value.isNull())
        return QStringLiteral("Null");
    switch (value.metaType().id()) {
    case QMetaType::Bool: return value.toBool() ? QStringLiteral("True") : QStringLiteral("False");
    case QMetaType::Int:
    case QMetaType::UInt:
    case QMetaType::Short:
    case QMetaType::UShort:
    case QMetaType::LongLong:
    case QMetaType::ULongLong:
    case QMetaType::Long: return QString::number(value.toLongLong());
    case QMetaType::Double:
    case QMetaType::Float: return QString::number(value.toDouble(), 'g', 15);
    default: break;
    }
    const QString t = value.toString();
    const auto plain = [](QChar c) {
        const char16_t u = c.unicode();
        return u != '"' && u != '\\' && u != '\n' && u != '\r' && u != '\t';
    };
    // Most texts need no escape: one copy rather than a character at a time.
    if (std::all_of(t.begin(), t.end(), plain))
        return QLatin1Char('"') + t + QLatin1Char('"');
    QString out;
    out.reserve(t.size() + 2);
    out += QLatin1Char('"');
    for (const QChar c : t) {
        switch (c.unicode()) {
        case '"': out += QLatin1String("\\\""); break;
        case '\\': out += QLatin1String("\\\\"); break;
        case '\n': out += QLatin1String("\\n"); break;
        case '\r': out += QLatin1String("\\r"); break;
        case '\t': out += QLatin1String("\\t"); break;
        default: out += c;
        }
    }
    out += QLatin1Char('"');
    return out;
}

struct JournalProvider::Sink {
    QFile file;
    qint64 line = 0;
    qint64 nanos = 0;
    bool failed = false;
    QString error;

    // Writes one line; its number is the answer of a call. Lines are
    // buffered and reach the file at the latest when the program is released.
    qint64 write(const QString& text)
    {
        ++line;
        if (!failed) {
            // One reused buffer: a run writes hundreds of thousands of lines.
            encoded.clear();
            encoded += text.toUtf8();
            encoded += '\n';
            if (file.write(encoded) != encoded.size()) {
                failed = true;
                error = file.errorString();
            }
        }
        return line;
    }

    QByteArray encoded;

    void flush()
    {
        if (!failed && !file.flush()) {
            failed = true;
            error = file.errorString();
        }
    }
};

namespace {
QString argList(const QVariantList& args)
{
    QString out;
    for (qsizetype i = 0; i < args.size(); ++i) {
        if (i > 0)
            out += QLatin1String(", ");
        out += journalValue(args[i]);
    }
    return out;
}

// Counts the time a journal call takes, formatting included.
struct Timing {
    explicit Timing(JournalProvider::Sink& sink) : sink(sink) { timer.start(); }
    ~Timing() { sink.nanos += timer.nsecsElapsed(); }
    JournalProvider::Sink& sink;
    QElapsedTimer timer;
};

class JournalObject : public AutomationObject {
public:
    JournalObject(std::shared_ptr<JournalProvider::Sink> sink, QString path, bool root)
        : m_sink(std::move(sink))
        , m_path(std::move(path))
        , m_root(root)
    {
    }

    ~JournalObject() override
    {
        if (m_root) {
            m_sink->write(QStringLiteral("release ") + m_path);
            m_sink->flush();
        }
    }

    bool call(const QString& member, const QVariantList& args, QVariant* result, QString* error) override
    {
        const Timing timing(*m_sink);
        // The line number is the answer; it is written with the line, so a
        // reader of the journal sees what each call returned.
        const qint64 next = m_sink->line + 1;
        const QString list = argList(args);
        if (list.contains(QLatin1Char('%')) || m_path.contains(QLatin1Char('%')) || member.contains(QLatin1Char('%'))) {
            // The number goes to the lowest %-placeholder of the whole
            // line, which text holding one changes; kept as lines have been.
            m_sink->write(QStringLiteral("%1.%2(%3) -> %4").arg(m_path, member, list).arg(next));
        } else {
            QString line;
            line.reserve(m_path.size() + member.size() + list.size() + 24);
            line += m_path;
            line += QLatin1Char('.');
            line += member;
            line += QLatin1Char('(');
            line += list;
            line += QLatin1String(") -> ");
            line += QString::number(next);
            m_sink->write(line);
        }
        if (result)
            *result = QVariant(qlonglong(next));
        return ok(error);
    }

    std::shared_ptr<AutomationObject> object(const QString& member, const QVariantList& args, QString* error) override
    {
        const Timing timing(*m_sink);
        QString path = m_path + QLatin1Char('.') + member;
        if (!args.isEmpty())
            path += QLatin1Char('(') + argList(args) + QLatin1Char(')');
        m_sink->write(path);
        if (!ok(error))
            return nullptr;
        return std::make_shared<JournalObject>(m_sink, path, false);
    }

    bool setProperty(const QString& name, const QVariant& value, QString* error) override
    {
        const Timing timing(*m_sink);
        m_sink->write(m_path + QLatin1Char('.') + name + QLatin1String(" = ") + journalValue(value));
        return ok(error);
    }

private:
    bool ok(QString* error) const
    {
        if (m_sink->failed && error)
            *error = QStringLiteral("כתיבת היומן נכשלה: ") + m_sink->error;
        return !m_sink->failed;
    }

    std::shared_ptr<JournalProvider::Sink> m_sink;
    QString m_path;
    bool m_root;
};
} // namespace

JournalProvider::JournalProvider(QString path)
    : m_sink(std::make_shared<Sink>())
{
    m_sink->file.setFileName(path);
}

JournalProvider::~JournalProvider() = default;

std::shared_ptr<AutomationObject> JournalProvider::create(const QString& progId, QString* error)
{
    if (!m_sink->file.isOpen()) {
        QDir().mkpath(QFileInfo(m_sink->file.fileName()).absolutePath());
        if (!m_sink->file.open(QIODevice::WriteOnly | QIODevice::Append | QIODevice::Text)) {
            *error = QStringLiteral("לא ניתן לפתוח את קובץ היומן %1: %2")
                         .arg(QDir::toNativeSeparators(m_sink->file.fileName()), m_sink->file.errorString());
            return nullptr;
        }
        // Lines continue the numbering of a journal that already holds some.
        m_sink->line = 0;
        QFile existing(m_sink->file.fileName());
        if (existing.open(QIODevice::ReadOnly))
            while (!existing.atEnd()) {
                existing.readLine();
                ++m_sink->line;
            }
    }
    m_sink->write(QStringLiteral("create ") + progId);
    m_sink->flush();
    return std::make_shared<JournalObject>(m_sink, progId, true);
}

qint64 JournalProvider::writingNanoseconds() const
{
    return m_sink->nanos;
}

} // namespace tagora
