#include "labels/programautomation.h"

#include <QDir>

#include <algorithm>
#include <charconv>
#include <cstring>

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
// Journal lines, written straight into one UTF-8 buffer whose capacity stays
// between lines: no text is built per call and encoded afterwards.
class LineBuffer {
public:
    const char* data() const { return m_buffer.constData(); }
    qsizetype size() const { return m_used; }
    void clear() { m_used = 0; }
    void truncate(qsizetype size) { m_used = size; }

    void putAscii(const char* text, qsizetype size)
    {
        std::memcpy(reserve(size), text, size_t(size));
        m_used += size;
    }
    template <qsizetype N>
    void putAscii(const char (&text)[N])
    {
        putAscii(text, N - 1);
    }
    void putBytes(const QByteArray& bytes) { putAscii(bytes.constData(), bytes.size()); }

    void putInteger(long long v)
    {
        char* out = reserve(24);
        m_used = std::to_chars(out, out + 24, v).ptr - m_buffer.constData();
    }

    // Text in UTF-8; quoted, in double quotes with " \ newline, return and
    // tab escaped. Text with surrogates (rare) goes through Qt's encoder from
    // the first one on, which also decides what a lone one becomes.
    void putText(QStringView text, bool quoted)
    {
        char* out = reserve(text.size() * 3 + 2);
        if (quoted)
            *out++ = '"';
        const char16_t* p = text.utf16();
        const char16_t* const end = p + text.size();
        for (; p != end; ++p) {
            const char16_t u = *p;
            if (u < 0x80) {
                if (quoted) {
                    char escaped = 0;
                    switch (u) {
                    case '"': escaped = '"'; break;
                    case '\\': escaped = '\\'; break;
                    case '\n': escaped = 'n'; break;
                    case '\r': escaped = 'r'; break;
                    case '\t': escaped = 't'; break;
                    default: break;
                    }
                    if (escaped) {
                        *out++ = '\\';
                        *out++ = escaped;
                        continue;
                    }
                }
                *out++ = char(u);
            } else if (u < 0x800) {
                *out++ = char(0xC0 | (u >> 6));
                *out++ = char(0x80 | (u & 0x3F));
            } else if (QChar::isSurrogate(u)) {
                m_used = out - m_buffer.constData();
                putRest(QStringView(p, end), quoted);
                return;
            } else {
                *out++ = char(0xE0 | (u >> 12));
                *out++ = char(0x80 | ((u >> 6) & 0x3F));
                *out++ = char(0x80 | (u & 0x3F));
            }
        }
        if (quoted)
            *out++ = '"';
        m_used = out - m_buffer.constData();
    }

private:
    QByteArray m_buffer; // its size is its capacity; the first m_used bytes are written
    qsizetype m_used = 0;

    // Room for n more bytes after what is written.
    char* reserve(qsizetype n)
    {
        if (m_used + n > m_buffer.size())
            m_buffer.resize(std::max(m_buffer.size() * 2, m_used + n + 1024));
        return m_buffer.data() + m_used;
    }

    void putRest(QStringView rest, bool quoted)
    {
        QString text;
        if (quoted) {
            for (const QChar c : rest) {
                switch (c.unicode()) {
                case '"': text += QLatin1String("\\\""); break;
                case '\\': text += QLatin1String("\\\\"); break;
                case '\n': text += QLatin1String("\\n"); break;
                case '\r': text += QLatin1String("\\r"); break;
                case '\t': text += QLatin1String("\\t"); break;
                default: text += c; break;
                }
            }
            text += QLatin1Char('"');
        } else {
            text = rest.toString();
        }
        putBytes(text.toUtf8());
    }
};

// Writes the value as the journal writes it.
void putValue(LineBuffer& out, const QVariant& value)
{
    // isNull() is also true for a value of no type.
    if (value.isNull()) {
        out.putAscii("Null");
        return;
    }
    switch (value.metaType().id()) {
    case QMetaType::Bool:
        if (*static_cast<const bool*>(value.constData()))
            out.putAscii("True");
        else
            out.putAscii("False");
        return;
    case QMetaType::Int: out.putInteger(*static_cast<const int*>(value.constData())); return;
    case QMetaType::LongLong: out.putInteger(*static_cast<const qlonglong*>(value.constData())); return;
    case QMetaType::UInt:
    case QMetaType::Short:
    case QMetaType::UShort:
    case QMetaType::ULongLong:
    case QMetaType::Long: out.putInteger(value.toLongLong()); return;
    case QMetaType::Double:
    case QMetaType::Float: out.putText(QString::number(value.toDouble(), 'g', 15), false); return;
    case QMetaType::QString: out.putText(*static_cast<const QString*>(value.constData()), true); return;
    default: out.putText(value.toString(), true); return;
    }
}

void putArgs(LineBuffer& out, const QVariantList& args)
{
    for (qsizetype i = 0; i < args.size(); ++i) {
        if (i > 0)
            out.putAscii(", ");
        putValue(out, args[i]);
    }
}
} // namespace

QString journalValue(const QVariant& value)
{
    LineBuffer out;
    putValue(out, value);
    return QString::fromUtf8(out.data(), out.size());
}

// The journal file and the lines not yet in it. Lines are built in place at
// the end of the buffer and reach the file in blocks of 64 KiB, at the latest
// when the program is released.
struct JournalProvider::Sink {
    QFile file;
    qint64 line = 0;
    bool failed = false;
    QString error;
    LineBuffer pending;
    qsizetype lineStart = 0;

    void beginLine() { lineStart = pending.size(); }

    // Ends the line begun last; its number is the answer of a call. After a
    // failed write lines are still counted, but no longer kept.
    qint64 endLine()
    {
        ++line;
        if (failed) {
            pending.truncate(lineStart);
            return line;
        }
        pending.putAscii("\n");
        if (pending.size() >= BufferBytes)
            drain();
        return line;
    }

    // The line begun last, as far as it is written.
    QByteArray lineSoFar() const
    {
        return QByteArray(pending.data() + lineStart, pending.size() - lineStart);
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

    // Between lines only.
    void drain()
    {
        if (!failed && pending.size() > 0 && file.write(pending.data(), pending.size()) != pending.size()) {
            failed = true;
            error = file.errorString();
        }
        pending.clear();
        lineStart = 0;
    }
};

namespace {
class JournalObject : public AutomationObject {
public:
    // path: the object's name as its lines start, in UTF-8.
    JournalObject(std::shared_ptr<JournalProvider::Sink> sink, QByteArray path, bool root)
        : m_sink(std::move(sink))
        , m_path(std::move(path))
        , m_root(root)
    {
    }

    ~JournalObject() override
    {
        if (m_root) {
            m_sink->beginLine();
            m_sink->pending.putAscii("release ");
            m_sink->pending.putBytes(m_path);
            m_sink->endLine();
            m_sink->flush();
        }
    }

    bool call(const QString& member, const QVariantList& args, QVariant* result, QString* error) override
    {
        // The line number is the answer; it is written with the line, so a
        // reader of the journal sees what each call returned.
        const qint64 next = m_sink->line + 1;
        LineBuffer& out = startLine(member);
        out.putAscii("(");
        putArgs(out, args);
        out.putAscii(") -> ");
        out.putInteger(next);
        m_sink->endLine();
        if (result)
            *result = QVariant(qlonglong(next));
        return ok(error);
    }

    std::shared_ptr<AutomationObject> object(const QString& member, const QVariantList& args, QString* error) override
    {
        LineBuffer& out = startLine(member);
        if (!args.isEmpty()) {
            out.putAscii("(");
            putArgs(out, args);
            out.putAscii(")");
        }
        QByteArray path = m_sink->lineSoFar();
        m_sink->endLine();
        if (!ok(error))
            return nullptr;
        return std::make_shared<JournalObject>(m_sink, std::move(path), false);
    }

    bool setProperty(const QString& name, const QVariant& value, QString* error) override
    {
        LineBuffer& out = startLine(name);
        out.putAscii(" = ");
        putValue(out, value);
        m_sink->endLine();
        return ok(error);
    }

private:
    // A new line, "PATH.MEMBER" so far.
    LineBuffer& startLine(const QString& member)
    {
        m_sink->beginLine();
        LineBuffer& out = m_sink->pending;
        out.putBytes(m_path);
        out.putAscii(".");
        out.putText(member, false);
        return out;
    }

    bool ok(QString* error) const
    {
        if (m_sink->failed && error)
            *error = QStringLiteral("כתיבת היומן נכשלה: ") + m_sink->error;
        return !m_sink->failed;
    }

    std::shared_ptr<JournalProvider::Sink> m_sink;
    QByteArray m_path;
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
    LineBuffer name;
    name.putText(progId, false);
    const QByteArray path(name.data(), name.size());
    m_sink->beginLine();
    m_sink->pending.putAscii("create ");
    m_sink->pending.putBytes(path);
    m_sink->endLine();
    m_sink->flush();
    return std::make_shared<JournalObject>(m_sink, path, true);
}

} // namespace tagora
