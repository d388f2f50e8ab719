#include "labels/numberformat.h"

#include <QHash>
#include <QStringList>
#include <QVarLengthArray>
#include <algorithm>
#include <cmath>
#include <cstring>
#include <memory>

namespace tagora {

namespace {
struct Section {
    QString prefix;
    QString suffix;
    int minInt = 0;
    int minFrac = 0;
    int maxFrac = 0;
    bool point = false;
    bool grouping = false;
    bool percent = false;
    bool placeholders = false;
};

// Splits at ';' outside quotes.
QStringList sections(const QString& pattern)
{
    QStringList out;
    QString cur;
    bool quoted = false;
    for (int i = 0; i < pattern.size(); ++i) {
        const QChar c = pattern[i];
        if (c == QLatin1Char('"'))
            quoted = !quoted;
        if (c == QLatin1Char('\\') && i + 1 < pattern.size()) {
            cur += c;
            cur += pattern[++i];
            continue;
        }
        if (c == QLatin1Char(';') && !quoted) {
            out << cur;
            cur.clear();
            continue;
        }
        cur += c;
    }
    out << cur;
    return out;
}

Section parse(const QString& text)
{
    Section s;
    bool seenDigits = false;
    bool inFraction = false;
    for (int i = 0; i < text.size(); ++i) {
        const QChar c = text[i];
        QString literal;
        if (c == QLatin1Char('"')) {
            const int end = text.indexOf(QLatin1Char('"'), i + 1);
            literal = text.mid(i + 1, (end < 0 ? text.size() : end) - i - 1);
            i = end < 0 ? int(text.size()) : end;
        } else if (c == QLatin1Char('\\') && i + 1 < text.size()) {
            literal = text[++i];
        } else if (c == QLatin1Char('0') || c == QLatin1Char('#')) {
            seenDigits = true;
            s.placeholders = true;
            if (inFraction) {
                ++s.maxFrac;
                if (c == QLatin1Char('0'))
                    s.minFrac = s.maxFrac;
            } else if (c == QLatin1Char('0')) {
                ++s.minInt;
            }
            continue;
        } else if (c == QLatin1Char('.') && !inFraction) {
            inFraction = true;
            s.point = true;
            seenDigits = true;
            continue;
        } else if (c == QLatin1Char(',') && seenDigits && !inFraction) {
            s.grouping = true;
            continue;
        } else {
            if (c == QLatin1Char('%'))
                s.percent = true;
            literal = c;
        }
        (seenDigits ? s.suffix : s.prefix) += literal;
    }
    return s;
}

QString named(const QString& pattern)
{
    const QString p = pattern.trimmed().toLower();
    if (p == QLatin1String("fixed"))
        return QStringLiteral("0.00");
    if (p == QLatin1String("standard"))
        return QStringLiteral("#,##0.00");
    if (p == QLatin1String("percent"))
        return QStringLiteral("0.00%");
    return pattern;
}

// Digits written into a small buffer rather than text per step: a run formats
// every price of every record.
using DigitBuffer = QVarLengthArray<char, 64>;

// The digits of |value| rounded to `decimals` places, halves away from zero,
// working on the number as its 15 significant digits write it: the whole
// part's digits then exactly `decimals` fraction digits, in *digits. Returns
// where the whole part starts (leading zeros skipped, one digit kept).
qsizetype roundedDigits(double value, int decimals, DigitBuffer* digits)
{
    const double a = std::fabs(value);
    const int magnitude = a >= 1.0 ? int(std::floor(std::log10(a))) : 0;
    const QString text = QString::number(a, 'f', std::max(0, 14 - magnitude));
    // text: digits, then '.' and digits when there are decimals
    const QChar* t = text.constData();
    qsizetype dot = text.indexOf(QLatin1Char('.'));
    if (dot < 0)
        dot = text.size();
    const qsizetype fracStart = dot + 1;
    const qsizetype fracAvailable = std::max<qsizetype>(0, text.size() - fracStart);
    const auto fracDigit = [&](qsizetype k) { return k < fracAvailable ? char(t[fracStart + k].unicode()) : '0'; };
    digits->clear();
    for (qsizetype i = 0; i < dot; ++i)
        digits->append(char(t[i].unicode()));
    for (int k = 0; k < decimals; ++k)
        digits->append(fracDigit(k));
    if (fracDigit(decimals) >= '5') {
        qsizetype i = digits->size() - 1;
        for (; i >= 0; --i) {
            char& d = (*digits)[i];
            if (d == '9') {
                d = '0';
            } else {
                ++d;
                break;
            }
        }
        if (i < 0)
            digits->insert(digits->cbegin(), '1');
    }
    const qsizetype intLen = digits->size() - decimals;
    qsizetype wholeStart = 0;
    while (intLen - wholeStart > 1 && (*digits)[wholeStart] == '0')
        ++wholeStart;
    return wholeStart;
}

bool anyNonZero(const char* digits, qsizetype size)
{
    for (qsizetype i = 0; i < size; ++i)
        if (digits[i] >= '1' && digits[i] <= '9')
            return true;
    return false;
}

QString render(double value, const Section& s, bool withSign)
{
    if (!s.placeholders)
        return s.prefix + s.suffix;
    const double v = s.percent ? value * 100.0 : value;
    DigitBuffer digits;
    const qsizetype wholeStart = roundedDigits(v, s.maxFrac, &digits);
    const char* whole = digits.constData() + wholeStart;
    qsizetype wholeLen = digits.size() - s.maxFrac - wholeStart;
    const char* frac = digits.constData() + digits.size() - s.maxFrac;
    qsizetype fracLen = s.maxFrac;
    while (fracLen > s.minFrac && frac[fracLen - 1] == '0')
        --fracLen;
    if (wholeLen == 1 && whole[0] == '0' && s.minInt == 0)
        wholeLen = 0;
    const bool zero = !anyNonZero(whole, wholeLen) && !anyNonZero(frac, fracLen);

    // The number: zeros up to the least whole digits, groups of three, the fraction.
    const qsizetype padding = std::max<qsizetype>(0, s.minInt - wholeLen);
    const qsizetype wholeDigits = padding + wholeLen;
    DigitBuffer number;
    number.reserve(wholeDigits + wholeDigits / 3 + 1 + fracLen);
    for (qsizetype i = 0; i < wholeDigits; ++i) {
        if (s.grouping && i > 0 && (wholeDigits - i) % 3 == 0)
            number.append(',');
        number.append(i < padding ? '0' : whole[i - padding]);
    }
    if (s.point) {
        number.append('.');
        number.append(frac, fracLen);
    }
    const bool minus = withSign && value < 0 && !zero;
    QString out;
    out.reserve(qsizetype(minus) + s.prefix.size() + number.size() + s.suffix.size());
    if (minus)
        out += QLatin1Char('-');
    out += s.prefix;
    out += QLatin1String(number.constData(), number.size());
    out += s.suffix;
    return out;
}

// A pattern as the formatter uses it, parsed once: a run formats every
// price of every record with the same one.
struct Pattern {
    bool general = false;
    int sectionCount = 0;
    Section positive;
    Section negative;
    Section zero;
    bool hasNegative = false;
    bool hasZero = false;
};

std::shared_ptr<const Pattern> compile(const QString& pattern)
{
    auto out = std::make_shared<Pattern>();
    const QString p = named(pattern);
    if (p.trimmed().isEmpty() || p.trimmed().compare(QLatin1String("general number"), Qt::CaseInsensitive) == 0) {
        out->general = true;
        return out;
    }
    const QStringList parts = sections(p);
    out->sectionCount = int(parts.size());
    out->positive = parse(parts[0]);
    out->hasNegative = parts.size() >= 2 && !parts[1].isEmpty();
    if (out->hasNegative)
        out->negative = parse(parts[1]);
    out->hasZero = parts.size() >= 3 && !parts[2].isEmpty();
    if (out->hasZero)
        out->zero = parse(parts[2]);
    return out;
}

const std::shared_ptr<const Pattern>& compiled(const QString& pattern)
{
    // Per thread, so no lock; bounded, since patterns come from users.
    thread_local QHash<QString, std::shared_ptr<const Pattern>> cache;
    thread_local QString lastPattern;
    thread_local std::shared_ptr<const Pattern> last;
    if (last && pattern == lastPattern)
        return last;
    auto it = cache.constFind(pattern);
    if (it == cache.constEnd()) {
        if (cache.size() >= 64)
            cache.clear();
        it = cache.insert(pattern, compile(pattern));
    }
    lastPattern = pattern;
    last = it.value();
    return last;
}

// The value as a number, the same one its text would read back as: a
// double's text is its shortest round-trip form, and an integer's text is
// exact, so both convert directly.
bool numberOf(const QVariant& value, double* out)
{
    switch (value.metaType().id()) {
    case QMetaType::Double: *out = value.toDouble(); return true;
    case QMetaType::Int: *out = double(value.toInt()); return true;
    case QMetaType::UInt: *out = double(value.toUInt()); return true;
    case QMetaType::LongLong: *out = double(value.toLongLong()); return true;
    case QMetaType::ULongLong: *out = double(value.toULongLong()); return true;
    default: break;
    }
    bool ok = false;
    *out = value.toString().trimmed().toDouble(&ok);
    return ok;
}
} // namespace

QString FormatNumber(const QVariant& value, const QString& pattern)
{
    if (!value.isValid() || value.isNull())
        return QString();
    double v = 0;
    if (!numberOf(value, &v) || !std::isfinite(v))
        return value.toString();
    const std::shared_ptr<const Pattern>& p = compiled(pattern);
    // A record often holds the same price in several fields (price, special
    // price, list price): the last number written by the last pattern is kept.
    thread_local std::shared_ptr<const Pattern> lastPattern;
    thread_local double lastValue = 0;
    thread_local QString lastText;
    if (lastPattern == p && std::memcmp(&lastValue, &v, sizeof v) == 0)
        return lastText;
    QString text;
    if (p->general)
        text = QString::number(v, 'g', 15);
    else if (v == 0 && p->hasZero)
        text = render(0, p->zero, false);
    else if (v < 0 && p->hasNegative)
        text = render(-v, p->negative, false);
    else
        text = render(v, p->positive, true);
    lastPattern = p;
    lastValue = v;
    lastText = text;
    return text;
}

} // namespace tagora
