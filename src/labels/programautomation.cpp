#include "labels/programautomation.h"

#include <QDir>

#include <charconv>

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

namespace {
void appendInteger(QString& out, long long v)
{
    char digits[24];
    const auto end = std::to_chars(digits, digits + sizeof digits, v).ptr;
    out += QLatin1String(digits, end - digits);
}

// Appends the value as the journal writes it, straight onto the line.
void appendJournalValue(QString& out, const QVariant& value)
{
    if (!value.isValid() || value.isNull()) {
        out += QLatin1String("Null");
        return;
    }
    switch (value.metaType().id()) {
    case QMetaType::Bool: out += value.toBool() ? QLatin1String("True") : QLatin1String("False"); return;
    case QMetaType::Int: appendInteger(out, *static_cast<const int*>(value.constData())); return;
    case QMetaType::LongLong: appendInteger(out, *static_cast<const qlonglong*>(value.constData())); return;
    case QMetaType::UInt:
    case QMetaType::Short:
    case QMetaType::UShort:
    case QMetaType::ULongLong:
    case QMetaType::Long: appendInteger(out, value.toLongLong()); return;
    case QMetaType::Double:
    case QMetaType::Float: out += QString::number(value.toDouble(), 'g', 15); return;
    default: break;
    }
    const QString t = value.metaType().id() == QMetaType::QString ? *static_cast<const QString*>(value.constData())
                                                                   : value.toString();
    out += QLatin1Char('"');
    qsizetype from = 0;
    for (qsizetype i = 0; i < t.size(); ++i) {
        QLatin1String escaped;
        switch (t[i].unicode()) {
        case '"': escaped = QLatin1String("\\\""); break;
        case '\\': escaped = QLatin1String("\\\\"); break;
        case '\n': escaped = QLatin1String("\\n"); break;
        case '\r': escaped = QLatin1String("\\r"); break;
        case '\t': escaped = QLatin1String("\\t"); break;
        default: continue;
        }
        out += QStringView(t).mid(from, i - from);
        out += escaped;
        from = i + 1;
    }
    out += QStringView(t).mid(from);
    out += QLatin1Char('"');
}
} // namespace

QString journalValue(const QVariant& value)
{
    QString out;
    appendJournalValue(out, value);
    return out;
}

struct JournalProvider::Sink {
    QFile file;
    qint64 line = 0;
    qint64 nanos = 0;
    bool failed = false;
    QString error;
    QString text; // the line being built

    // Writes one line; its number is the answer of a call. Lines are
    // buffered and reach the file at the latest when the program is released.
    qint64 write(const QString& text)
    {
        ++line;
        if (failed)
            return line;
        encode(text);
        pending += '\n';
        if (pending.size() >= BufferBytes)
            drain();
        return line;
    }

    void flush()
    {
        drain();
        if (!failed && !file.flush()) {
            failed = true;
            error = file.errorString();
        }
    }

private:
    static constexpr qsizetype BufferBytes = 64 * 1024;
    QByteArray pending;

    // UTF-8 written in place; text with surrogates (rare) goes through Qt's
    // encoder, which also decides what a lone one becomes.
    void encode(const QString& text)
    {
        qsizetype at = pending.size();
        pending.resize(at + text.size() * 3);
        char* out = pending.data() + at;
        for (const QChar c : text) {
            const char16_t u = c.unicode();
            if (u < 0x80) {
                *out++ = char(u);
            } else if (u < 0x800) {
                *out++ = char(0xC0 | (u >> 6));
                *out++ = char(0x80 | (u & 0x3F));
            } else if (c.isSurrogate()) {
                pending.resize(at);
                pending += text.toUtf8();
                return;
            } else {
                *out++ = char(0xE0 | (u >> 12));
                *out++ = char(0x80 | ((u >> 6) & 0x3F));
                *out++ = char(0x80 | (u & 0x3F));
            }
        }
        pending.resize(out - pending.constData());
    }

    void drain()
    {
        if (failed || pending.isEmpty()) {
            pending.resize(0);
            return;
        }
        if (file.write(pending) != pending.size()) {
            failed = true;
            error = file.errorString();
        }
        pending.resize(0);
    }
};

namespace {
void appendArgs(QString& out, const QVariantList& args)
{
    for (qsizetype i = 0; i < args.size(); ++i) {
        if (i > 0)
            out += QLatin1String(", ");
        appendJournalValue(out, args[i]);
    }
}

QString argList(const QVariantList& args)
{
    QString out;
    appendArgs(out, args);
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
        QString& line = startLine(member);
        line += QLatin1Char('(');
        appendArgs(line, args);
        line += QLatin1String(") -> ");
        appendInteger(line, next);
        m_sink->write(line);
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
        QString& line = startLine(name);
        line += QLatin1String(" = ");
        appendJournalValue(line, value);
        m_sink->write(line);
        return ok(error);
    }

private:
    // "PATH.MEMBER" in the one line buffer, whose capacity stays between calls.
    QString& startLine(const QString& member)
    {
        QString& line = m_sink->text;
        line.resize(0);
        line += m_path;
        line += QLatin1Char('.');
        line += member;
        return line;
    }

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
