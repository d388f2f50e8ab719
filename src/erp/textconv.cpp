#include "erp/textconv.h"

#include <cmath>
#include <optional>

namespace tagora {

namespace {
short s_connType = 1;

const QDate kSerialZero(1899, 12, 30);

bool isRunChar(QChar c)
{
    const ushort u = c.unicode();
    return (u >= '0' && u <= '9') || (u >= 'A' && u <= 'Z') || (u >= 'a' && u <= 'z');
}

bool isJoiner(QChar c)
{
    const ushort u = c.unicode();
    return u == '+' || u == '-' || u == '.' || u == '/' || u == '\\';
}

QChar mirrorBracket(QChar c)
{
    switch (c.unicode()) {
    case '(': return QLatin1Char(')');
    case ')': return QLatin1Char('(');
    case '[': return QLatin1Char(']');
    case ']': return QLatin1Char('[');
    case '{': return QLatin1Char('}');
    case '}': return QLatin1Char('{');
    default: return c;
    }
}

bool isNullish(const QVariant& v)
{
    return !v.isValid() || v.isNull();
}

// Whole-number rounding as the platform's conversions did it: halves to even.
long long roundHalfEven(double d)
{
    const double r = std::nearbyint(d);
    return static_cast<long long>(r);
}

std::optional<QDateTime> asDateTime(const QVariant& v)
{
    switch (v.metaType().id()) {
    case QMetaType::QDateTime: return v.toDateTime();
    case QMetaType::QDate: return QDateTime(v.toDate(), QTime(0, 0));
    case QMetaType::QString: {
        const QString t = v.toString().trimmed();
        QDateTime dt = QDateTime::fromString(t, Qt::ISODate);
        if (!dt.isValid())
            dt = QDateTime::fromString(t, QStringLiteral("yyyy-MM-dd HH:mm:ss"));
        if (!dt.isValid()) {
            const QDate d = QDate::fromString(t, Qt::ISODate);
            if (d.isValid())
                dt = QDateTime(d, QTime(0, 0));
        }
        if (dt.isValid())
            return dt;
        return std::nullopt;
    }
    default: return std::nullopt;
    }
}
} // namespace

QChar MirrorChar(QChar c)
{
    switch (c.unicode()) {
    case '<': return QLatin1Char('>');
    case '>': return QLatin1Char('<');
    default: return mirrorBracket(c);
    }
}

short erpConnType()
{
    return s_connType;
}

void setErpConnType(short type)
{
    s_connType = type;
}

QString VisualToLogical(const QString& text, short connType)
{
    if (connType != 0 && connType != 1)
        return text;
    QString result;
    QString run;
    result.reserve(text.size());
    for (qsizetype i = 0; i < text.size();) {
        const qsizetype units = CharUnitsAt(text, i);
        const QChar c = text[i];
        const QStringView one = QStringView(text).mid(i, units);
        i += units;
        const QChar mirrored = mirrorBracket(c);
        const QStringView m = units == 1 ? QStringView(&mirrored, 1) : one;
        if (units == 1 && isRunChar(c)) {
            run += m;
        } else if (units == 1 && isJoiner(c)) {
            if (!run.isEmpty())
                run += m;
            else
                result.prepend(m);
        } else {
            if (!run.isEmpty()) {
                result.prepend(run);
                run.clear();
            }
            result.prepend(m);
        }
    }
    if (!run.isEmpty())
        result.prepend(run);
    return result;
}

QString VisualToLogical(const QString& text)
{
    return VisualToLogical(text, s_connType);
}

QString ReverseForCells(const QString& text, short connType)
{
    QString out;
    out.reserve(text.size() * 2 + 1);
    auto add = [&out](QStringView one) {
        out += kCellSeparator;
        if (one.size() == 1)
            out += MirrorChar(one.front());
        else
            out += one;
    };
    // Type 2 keeps the characters in their own order, still mirrored.
    if (connType == 2) {
        for (qsizetype i = 0; i < text.size(); i += CharUnitsAt(text, i))
            add(QStringView(text).mid(i, CharUnitsAt(text, i)));
    } else {
        for (qsizetype end = text.size(); end > 0;) {
            const qsizetype units = end >= 2 && text[end - 1].isLowSurrogate() && text[end - 2].isHighSurrogate() ? 2 : 1;
            end -= units;
            add(QStringView(text).mid(end, units));
        }
    }
    out += kCellSeparator;
    return out;
}

QString ReverseForCells(const QString& text)
{
    return ReverseForCells(text, s_connType);
}

// An emoji or a mathematical letter is a surrogate pair that must move and
// be cut as one.
qsizetype CharUnitsAt(const QString& text, qsizetype i)
{
    return text[i].isHighSurrogate() && i + 1 < text.size() && text[i + 1].isLowSurrogate() ? 2 : 1;
}

QString LeftChars(const QString& text, int count)
{
    qsizetype end = 0;
    for (int n = 0; n < count && end < text.size(); ++n)
        end += CharUnitsAt(text, end);
    return text.left(end);
}

int CharCount(const QString& text)
{
    int n = 0;
    for (qsizetype i = 0; i < text.size(); i += CharUnitsAt(text, i))
        ++n;
    return n;
}

bool HasHebrewLetters(const QString& text)
{
    // Windows-1255 codes 224..250 are exactly the letters alef to tav, U+05D0..U+05EA.
    for (const QChar c : text)
        if (c.unicode() >= 0x05D0 && c.unicode() <= 0x05EA)
            return true;
    return false;
}

namespace {
// The guards both ERP text conversions share: the default for nothing, and
// the conversion only for Hebrew text of a visual-order connection.
template <class Convert>
QString convertHebrew(const QVariant& value, const QString& defaultText, Convert convert)
{
    if (isNullish(value))
        return defaultText;
    const QString t = value.toString();
    if (t.isEmpty())
        return defaultText;
    if ((s_connType == 0 || s_connType == 1) && HasHebrewLetters(t))
        return convert(t, s_connType);
    return t;
}
} // namespace

QString ConvertErpText(const QVariant& value, const QString& defaultText)
{
    return convertHebrew(value, defaultText, [](const QString& t, short type) { return VisualToLogical(t, type); });
}

QString ConvertErpLabelText(const QVariant& value, const QString& defaultText)
{
    return convertHebrew(value, defaultText, [](const QString& t, short type) { return ReverseForCells(t, type); });
}

QString ErpTextOrNbsp(const QVariant& value)
{
    if (isNullish(value))
        return QStringLiteral("&nbsp;");
    return ConvertErpText(value, QString());
}

QString NullToNbsp(const QVariant& value)
{
    if (isNullish(value))
        return QStringLiteral("&nbsp;");
    return value.toString();
}

// Blanks only: a tab, a line break or a no-break space at either end is part
// of the ERP's value and stays.
QString NullTrim(const QVariant& value)
{
    if (isNullish(value))
        return QString();
    const QString t = value.toString();
    qsizetype from = 0, to = t.size();
    while (from < to && t[from] == QLatin1Char(' '))
        ++from;
    while (to > from && t[to - 1] == QLatin1Char(' '))
        --to;
    return t.mid(from, to - from);
}

double NullToDouble(const QVariant& value)
{
    if (isNullish(value))
        return 0;
    // A number read as a number is that number: its text reads back to the
    // same double, so the detour through text is skipped.
    switch (value.metaType().id()) {
    case QMetaType::Double: {
        const double d = value.toDouble();
        return std::isfinite(d) ? d : 0;
    }
    case QMetaType::LongLong:
        return double(value.toLongLong());
    case QMetaType::Int:
        return double(value.toInt());
    default:
        break;
    }
    bool ok = false;
    const double d = value.toString().trimmed().toDouble(&ok);
    return ok && std::isfinite(d) ? d : 0;
}

short NullToInteger(const QVariant& value)
{
    if (isNullish(value))
        return 0;
    const double d = NullToDouble(value);
    const long long n = roundHalfEven(d);
    if (n < -32768 || n > 32767)
        return 0;
    return short(n);
}

QString QuoteToApostrophe(const QString& text)
{
    QString t = text;
    t.replace(QLatin1Char('"'), QLatin1Char('\''));
    return t;
}

QDate serialToDate(long long serial)
{
    return kSerialZero.addDays(serial);
}

double dateToSerial(const QDateTime& when)
{
    const double days = double(kSerialZero.daysTo(when.date()));
    return days + when.time().msecsSinceStartOfDay() / 86400000.0;
}

QVariant ErpToDate(const QVariant& value, short connType)
{
    if (isNullish(value))
        return QVariant();
    if (connType != 2)
        return value;
    bool ok = false;
    const double minutes = value.toDouble(&ok);
    if (!ok)
        return value;
    const double serial = minutes / 1440.0 + kErpEpochSerial;
    const double whole = std::floor(serial);
    const QDate date = serialToDate(static_cast<long long>(whole));
    const qint64 ms = static_cast<qint64>(std::llround((serial - whole) * 86400000.0));
    return QDateTime(date, QTime(0, 0)).addMSecs(ms);
}

QVariant ErpToDate(const QVariant& value)
{
    return ErpToDate(value, s_connType);
}

QVariant DateToErp(const QVariant& value, short connType)
{
    if (isNullish(value))
        return QVariant();
    if (connType != 2)
        return value;
    const auto when = asDateTime(value);
    if (!when)
        return QVariant();
    const long long day = roundHalfEven(dateToSerial(*when));
    return QVariant(qint32((day - kErpEpochSerial) * 1440));
}

QVariant DateToErp(const QVariant& value)
{
    return DateToErp(value, s_connType);
}

QString DateToErpLiteral(const QVariant& value, short connType)
{
    if (isNullish(value))
        return QString();
    if (connType == 2)
        return DateToErp(value, 2).toString();
    const auto when = asDateTime(value);
    if (!when)
        return QString();
    return QLatin1Char('#') + when->date().toString(QStringLiteral("dd/MM/yyyy")) + QLatin1Char('#');
}

QString DateToErpLiteral(const QVariant& value)
{
    return DateToErpLiteral(value, s_connType);
}

} // namespace tagora
