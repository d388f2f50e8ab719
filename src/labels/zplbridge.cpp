#include "labels/zplbridge.h"

#include "platform/printercatalog.h"

#include <QDeadlineTimer>
#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QSaveFile>
#include <QStringDecoder>
#include <QTcpSocket>
#include <utility>

#include <fribidi.h>

namespace tagora {

namespace {

using Part = ZplSink::Part;

constexpr int DefaultTimeoutSeconds = 60;

bool isHebrew(char32_t c)
{
    return (c >= 0x0590 && c <= 0x05FF) || (c >= 0xFB1D && c <= 0xFB4F);
}

// Marks that steer the algorithm but have no glyph: a printer font draws
// them as boxes, and once the text is in visual order they have done their work.
bool isBidiControl(char32_t c)
{
    return c == 0x200E || c == 0x200F || c == 0x061C || (c >= 0x202A && c <= 0x202E)
        || (c >= 0x2066 && c <= 0x2069);
}

QString visualLine(const QString& line)
{
    std::vector<FriBidiChar> text;
    text.reserve(line.size());
    bool hebrew = false;
    for (char32_t c : line.toUcs4()) {
        text.push_back(c);
        hebrew = hebrew || isHebrew(c);
    }
    const auto n = FriBidiStrIndex(text.size());
    if (n == 0)
        return line;

    std::vector<FriBidiCharType> types(text.size());
    std::vector<FriBidiBracketType> brackets(text.size());
    std::vector<FriBidiLevel> levels(text.size());
    fribidi_get_bidi_types(text.data(), n, types.data());
    fribidi_get_bracket_types(text.data(), n, types.data(), brackets.data());
    FriBidiParType direction = hebrew ? FRIBIDI_PAR_RTL : FRIBIDI_PAR_ON;
    if (!fribidi_get_par_embedding_levels_ex(types.data(), brackets.data(), n, &direction, levels.data()))
        return line; // out of memory in FriBidi: the logical text beats none
    fribidi_shape_mirroring(levels.data(), n, text.data());
    if (!fribidi_reorder_line(FRIBIDI_FLAGS_DEFAULT, types.data(), n, 0, direction, levels.data(), text.data(),
                              nullptr))
        return line;

    QString out;
    out.reserve(line.size());
    for (FriBidiChar c : text) {
        if (isBidiControl(c))
            continue;
        const char32_t u = c;
        out += QString::fromUcs4(&u, 1);
    }
    return out;
}

// A value written into field data under hex indicator `indicator`: the
// command prefixes and the indicator itself as hex bytes, the rest as it is.
QString hexEscaped(const QString& value, QChar indicator)
{
    QString out;
    out.reserve(value.size());
    for (QChar c : value) {
        if (c == u'^' || c == u'~' || c == indicator) {
            for (char byte : QString(c).toUtf8())
                out += indicator + QString::asprintf("%02X", unsigned(uchar(byte)));
        } else {
            out += c;
        }
    }
    return out;
}

bool isCommandPrefix(QChar c) { return c == u'^' || c == u'~'; }

// Index of the next command prefix at or after `from`, or the text's end.
qsizetype nextCommand(const QString& t, qsizetype from)
{
    for (qsizetype i = from; i < t.size(); ++i)
        if (isCommandPrefix(t[i]))
            return i;
    return t.size();
}

// A placeholder ${Name} starting at `at`: its name and the index past it.
bool placeholderAt(const QString& t, qsizetype at, QString* name, qsizetype* end)
{
    if (t.mid(at, 2) != QLatin1String("${"))
        return false;
    const qsizetype close = t.indexOf(u'}', at + 2);
    if (close < 0)
        return false;
    const QString n = t.mid(at + 2, close - at - 2);
    if (n.isEmpty())
        return false;
    for (QChar c : n)
        if (c.category() == QChar::Other_Control || c.isSpace() || isCommandPrefix(c) || c == u'$' || c == u'{')
            return false;
    *name = n;
    *end = close + 1;
    return true;
}

void appendText(std::vector<Part>& parts, const QString& text)
{
    if (!parts.empty() && parts.back().kind == Part::Kind::Text)
        parts.back().text += text;
    else
        parts.push_back(Part{Part::Kind::Text, text, false, false, QChar()});
}

// The character set a format declares (^CIn between its ^XA at `from` and
// its ^XZ): 28 when it declares UTF-8, -1 when it declares none, otherwise
// the first other set.
int declaredCharset(const QString& t, qsizetype from)
{
    qsizetype end = t.indexOf(QLatin1String("^XZ"), from, Qt::CaseInsensitive);
    if (end < 0)
        end = t.size();
    int found = -1;
    for (qsizetype i = t.indexOf(QLatin1String("^CI"), from, Qt::CaseInsensitive); i >= 0 && i < end;
         i = t.indexOf(QLatin1String("^CI"), i + 3, Qt::CaseInsensitive)) {
        qsizetype j = i + 3;
        while (j < end && t[j].isDigit())
            ++j;
        const int set = t.mid(i + 3, j - i - 3).toInt(); // ^CI alone is set 0
        if (set != 28)
            return set;
        found = 28;
    }
    return found;
}

// Parses a template into parts ready for expansion: ^CI28 after each ^XA
// that lacks it, ^FH\ before the data of each field that has a variable and
// no ^FH, and the quantity of the last format's ^PQ (added before its ^XZ
// when the format has none) as the copies part.
bool parseTemplate(const QString& t, const QString& file, std::vector<Part>* parts, QSet<QString>* names,
                   QString* error)
{
    const qsizetype lastXZ = t.lastIndexOf(QLatin1String("^XZ"), -1, Qt::CaseInsensitive);
    const qsizetype lastXA = lastXZ < 0 ? -1 : t.lastIndexOf(QLatin1String("^XA"), lastXZ, Qt::CaseInsensitive);
    if (lastXA < 0) {
        *error = QStringLiteral("קובץ המדבקה %1 אינו תבנית ZPL: אין בו תבנית שלמה (‎^XA...^XZ)").arg(file);
        return false;
    }

    // The field being read: from one ^FS (or ^XA) to the next.
    bool hasFH = false;
    QChar indicator;
    bool barcode = false;
    bool inData = false;          // after ^FD or ^FV, up to the next command
    bool escapeBackslash = false; // the data's ^FH\ is ours: its own backslashes are text
    bool lastHasPQ = false;

    const auto newField = [&] {
        hasFH = false;
        indicator = QChar();
        barcode = false;
    };

    qsizetype i = 0;
    while (i < t.size()) {
        const QChar c = t[i];
        QString name;
        qsizetype end = 0;
        if (c == u'$' && placeholderAt(t, i, &name, &end)) {
            names->insert(name);
            parts->push_back(Part{Part::Kind::Variable, name, inData, inData && !barcode, indicator});
            i = end;
            continue;
        }
        if (!isCommandPrefix(c)) {
            const bool escape = inData && escapeBackslash;
            if (escape && c == u'\\') {
                appendText(*parts, QStringLiteral("\\5C"));
                ++i;
                continue;
            }
            // The plain text up to what may need a look.
            qsizetype j = i + 1;
            while (j < t.size() && t[j] != u'$' && !isCommandPrefix(t[j]) && !(escape && t[j] == u'\\'))
                ++j;
            appendText(*parts, t.mid(i, j - i));
            i = j;
            continue;
        }

        inData = false;
        const QString code = t.mid(i + 1, 2).toUpper();
        if (c == u'~') {
            appendText(*parts, QString(c));
            ++i;
            continue;
        }
        if (code == QLatin1String("XA")) {
            newField();
            appendText(*parts, t.mid(i, 3));
            const int set = declaredCharset(t, i + 3);
            if (set >= 0 && set != 28) {
                *error = QStringLiteral("קובץ המדבקה %1 מגדיר קידוד ‎^CI%2, אבל המדבקות נשלחות ב-UTF-8 (‎^CI28)")
                             .arg(file)
                             .arg(set);
                return false;
            }
            if (set < 0)
                appendText(*parts, QStringLiteral("^CI28"));
            i += 3;
        } else if (code == QLatin1String("FS")) {
            newField();
            appendText(*parts, t.mid(i, 3));
            i += 3;
        } else if (code == QLatin1String("FH")) {
            hasFH = true;
            const QChar next = i + 3 < t.size() ? t[i + 3] : QChar();
            indicator = next.isNull() || isCommandPrefix(next) || next.isSpace() ? QChar(u'_') : next;
            appendText(*parts, t.mid(i, 3));
            i += 3;
        } else if (code == QLatin1String("FD") || code == QLatin1String("FV")) {
            const qsizetype dataEnd = nextCommand(t, i + 3);
            escapeBackslash = false;
            if (!hasFH && t.mid(i + 3, dataEnd - i - 3).contains(QLatin1String("${"))) {
                appendText(*parts, QStringLiteral("^FH\\"));
                hasFH = true;
                indicator = u'\\';
                escapeBackslash = true;
            }
            appendText(*parts, t.mid(i, 3));
            inData = true;
            i += 3;
        } else if (code == QLatin1String("PQ") && i > lastXA && i < lastXZ) {
            // The quantity is ours; the rest of the command (pause, replicates,
            // override, cutter) stays as the template has it.
            lastHasPQ = true;
            appendText(*parts, t.mid(i, 3));
            qsizetype j = i + 3;
            while (j < t.size() && t[j] != u',' && !isCommandPrefix(t[j])) {
                if (placeholderAt(t, j, &name, &end)) {
                    names->insert(name);
                    j = end;
                } else {
                    ++j;
                }
            }
            parts->push_back(Part{Part::Kind::Copies, QString(), false, false, QChar()});
            i = j;
        } else if (i == lastXZ) {
            if (!lastHasPQ) {
                appendText(*parts, QStringLiteral("^PQ"));
                parts->push_back(Part{Part::Kind::Copies, QString(), false, false, QChar()});
            }
            appendText(*parts, t.mid(i, 3));
            i += 3;
        } else {
            // ^BY sets barcode defaults; every other ^B command draws a barcode.
            if (code.size() == 2 && code[0] == u'B' && code[1] != u'Y')
                barcode = true;
            appendText(*parts, QString(c));
            ++i;
        }
    }
    return true;
}

bool readTemplate(const QString& file, QString* text, QString* error)
{
    QFile f(file);
    if (!QFileInfo(file).isFile()) {
        *error = QStringLiteral("קובץ המדבקה לא נמצא: %1").arg(file);
        return false;
    }
    if (!f.open(QIODevice::ReadOnly)) {
        *error = QStringLiteral("לא ניתן לקרוא את קובץ המדבקה %1: %2").arg(file, f.errorString());
        return false;
    }
    const QByteArray bytes = f.readAll();
    if (f.error() != QFileDevice::NoError) {
        *error = QStringLiteral("לא ניתן לקרוא את קובץ המדבקה %1: %2").arg(file, f.errorString());
        return false;
    }
    QStringDecoder decode(QStringDecoder::Utf8);
    *text = decode(bytes);
    if (decode.hasError()) {
        *error = QStringLiteral("קובץ המדבקה %1 אינו טקסט UTF-8").arg(file);
        return false;
    }
    if (text->startsWith(QChar(0xFEFF)))
        text->remove(0, 1);
    return true;
}

// A command's parameter cannot quote anything: a prefix or a control
// character in the value would end the command and start another.
bool plainParameter(const QString& value)
{
    for (QChar c : value)
        if (isCommandPrefix(c) || c.category() == QChar::Other_Control)
            return false;
    return true;
}

} // namespace

QString VisualOrder(const QString& logical)
{
    if (logical.isEmpty())
        return logical;
    // Each line is a paragraph of its own, as the algorithm defines it.
    QString out;
    qsizetype start = 0;
    for (qsizetype i = 0; i <= logical.size(); ++i) {
        if (i < logical.size() && logical[i] != u'\n' && logical[i] != u'\r')
            continue;
        out += visualLine(logical.mid(start, i - start));
        if (i < logical.size())
            out += logical[i];
        start = i + 1;
    }
    return out;
}

bool ParseZplHost(const QString& text, QString* host, quint16* port)
{
    const QString t = text.trimmed();
    QString h = t;
    QString p;
    if (t.startsWith(u'[')) {
        const qsizetype close = t.indexOf(u']');
        if (close < 0)
            return false;
        h = t.mid(1, close - 1);
        const QString rest = t.mid(close + 1);
        if (!rest.isEmpty()) {
            if (!rest.startsWith(u':'))
                return false;
            p = rest.mid(1);
        }
    } else if (t.count(u':') == 1) {
        const qsizetype colon = t.indexOf(u':');
        h = t.left(colon);
        p = t.mid(colon + 1);
    }
    if (h.isEmpty())
        return false;
    int number = 9100;
    if (!p.isNull()) {
        bool ok = false;
        number = p.toInt(&ok);
        if (!ok || number < 1 || number > 65535)
            return false;
    }
    *host = h;
    *port = quint16(number);
    return true;
}

ZplSink::ZplSink(BridgeOptions options)
    : m_options(std::move(options))
{
}

// Records collected and never closed belong to a run that failed: they are
// dropped, not printed half.
ZplSink::~ZplSink() = default;

bool ZplSink::openLabel(const QString& file, QString* error)
{
    // A file left open is finished first, so what it collected is not lost.
    if (!m_file.isEmpty() && !closeLabel(error))
        return false;
    QString text;
    std::vector<Part> parts;
    QSet<QString> names;
    if (!readTemplate(file, &text, error) || !parseTemplate(text, file, &parts, &names, error))
        return false;
    m_file = file;
    m_parts = std::move(parts);
    m_names = std::move(names);
    m_values.clear();
    m_job.clear();
    return true;
}

bool ZplSink::setVariable(const QString& name, const QString& value, QString* error)
{
    if (m_file.isEmpty()) {
        *error = QStringLiteral("לא נפתח קובץ מדבקה");
        return false;
    }
    if (!m_names.contains(name)) {
        *error = QStringLiteral("המשתנה %1 אינו מופיע בקובץ המדבקה %2").arg(name, m_file);
        return false;
    }
    m_values.insert(name, value);
    return true;
}

bool ZplSink::printRecord(int copies, QString* error)
{
    if (m_file.isEmpty()) {
        *error = QStringLiteral("לא נפתח קובץ מדבקה");
        return false;
    }
    if (copies <= 0)
        return true;
    QString label;
    for (const Part& p : m_parts) {
        switch (p.kind) {
        case Part::Kind::Text:
            label += p.text;
            break;
        case Part::Kind::Copies:
            label += QString::number(copies);
            break;
        case Part::Kind::Variable: {
            const QString value = m_values.value(p.text);
            if (p.field) {
                label += hexEscaped(p.visual ? VisualOrder(value) : value, p.indicator);
            } else if (plainParameter(value)) {
                label += value;
            } else {
                *error = QStringLiteral("ערך המשתנה %1 מכיל ^, ~ או תו בקרה ואינו יכול לשמש בפקודת ZPL בקובץ %2")
                             .arg(p.text, m_file);
                return false;
            }
            break;
        }
        }
    }
    m_job += label.toUtf8();
    return true;
}

bool ZplSink::closeLabel(QString* error)
{
    if (m_file.isEmpty())
        return true;
    const QByteArray job = std::exchange(m_job, QByteArray());
    const QString title = QFileInfo(m_file).fileName();
    m_file.clear();
    m_parts.clear();
    m_names.clear();
    m_values.clear();
    return job.isEmpty() || send(job, title, error);
}

bool ZplSink::send(const QByteArray& job, const QString& title, QString* error)
{
    const int seconds = m_options.timeoutSeconds > 0 ? m_options.timeoutSeconds : DefaultTimeoutSeconds;
    if (!m_options.zplHost.trimmed().isEmpty()) {
        QString host;
        quint16 port = 0;
        if (!ParseZplHost(m_options.zplHost, &host, &port)) {
            *error = QStringLiteral("כתובת מדפסת ה-ZPL אינה תקינה: %1 (צריך host:port)").arg(m_options.zplHost);
            return false;
        }
        // Raw port printing answers nothing: the job is out once the socket
        // has written every byte and closed within the time allowed.
        const QDeadlineTimer deadline{std::chrono::seconds(seconds)};
        const auto left = [&] { return int(qMax<qint64>(0, deadline.remainingTime())); };
        QTcpSocket socket;
        socket.connectToHost(host, port);
        bool ok = socket.waitForConnected(left());
        if (ok)
            ok = socket.write(job) == job.size();
        while (ok && socket.bytesToWrite() > 0)
            ok = socket.waitForBytesWritten(left());
        if (ok) {
            socket.disconnectFromHost();
            ok = socket.state() == QAbstractSocket::UnconnectedState || socket.waitForDisconnected(left());
        }
        if (!ok) {
            const QString reason = socket.error() == QAbstractSocket::UnknownSocketError
                ? QStringLiteral("לא הגיבה תוך %1 שניות").arg(seconds)
                : socket.errorString();
            *error = QStringLiteral("מדפסת ה-ZPL ‏%1 לא קיבלה את המדבקות: %2").arg(m_options.zplHost, reason);
            socket.abort();
            return false;
        }
        return true;
    }

    if (m_options.jobFolder.isEmpty()) {
        *error = QStringLiteral("לא הוגדרה תיקיית עבודה למדבקות ZPL");
        return false;
    }
    const QDir folder(m_options.jobFolder);
    QString path;
    for (int n = 1;; ++n) {
        path = folder.filePath(QStringLiteral("tgrlab-%1.zpl").arg(n, 3, 10, QLatin1Char('0')));
        if (!QFileInfo::exists(path))
            break;
    }
    QSaveFile out(path);
    if (!out.open(QIODevice::WriteOnly) || out.write(job) != job.size() || !out.commit()) {
        *error = QStringLiteral("לא ניתן לכתוב את קובץ המדבקות %1: %2").arg(path, out.errorString());
        return false;
    }
    if (m_options.printer.isEmpty())
        return true;
    QString reason;
    if (!PrintFileOnCups(m_options.printer, path, true, title, seconds, &reason)) {
        *error = QStringLiteral("המדפסת %1 לא קיבלה את המדבקות: %2").arg(m_options.printer, reason);
        return false;
    }
    return true;
}

} // namespace tagora
