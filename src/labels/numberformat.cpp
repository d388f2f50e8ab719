#include "labels/numberformat.h"

#include <QHash>
#include <QStringList>
#include <cmath>
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

// The digits of |value| rounded to `decimals` places, halves away from zero,
// working on the number as its 15 significant digits write it.
std::pair<QString, QString> roundedDigits(double value, int decimals)
{
    const double a = std::fabs(value);
    const int magnitude = a >= 1.0 ? int(std::floor(std::log10(a))) : 0;
    QString text = QString::number(a, 'f', std::max(0, 14 - magnitude));
    // text: digits '.' digits
    int dot = text.indexOf(QLatin1Char('.'));
    if (dot < 0) {
        text += QLatin1Char('.');
        dot = int(text.size()) - 1;
    }
    QString intPart = text.left(dot);
    QString frac = text.mid(dot + 1);
    while (frac.size() < decimals + 1)
        frac += QLatin1Char('0');
    const bool up = frac[decimals] >= QLatin1Char('5');
    QString digits = intPart + frac.left(decimals);
    if (up) {
        int i = int(digits.size()) - 1;
        while (i >= 0) {
            if (digits[i] == QLatin1Char('9')) {
                digits[i] = QLatin1Char('0');
                --i;
            } else {
                digits[i] = QChar(digits[i].unicode() + 1);
                break;
            }
        }
        if (i < 0)
            digits.prepend(QLatin1Char('1'));
    }
    const int intLen = int(digits.size()) - decimals;
    QString whole = digits.left(intLen);
    while (whole.size() > 1 && whole.startsWith(QLatin1Char('0')))
        whole.remove(0, 1);
    return {whole, digits.mid(intLen)};
}

QString render(double value, const Section& s, bool withSign)
{
    if (!s.placeholders)
        return s.prefix + s.suffix;
    const double v = s.percent ? value * 100.0 : value;
    auto [whole, frac] = roundedDigits(v, s.maxFrac);
    while (frac.size() > s.minFrac && frac.endsWith(QLatin1Char('0')))
        frac.chop(1);
    if (whole == QLatin1String("0") && s.minInt == 0)
        whole.clear();
    while (whole.size() < s.minInt)
        whole.prepend(QLatin1Char('0'));
    if (s.grouping)
        for (int i = int(whole.size()) - 3; i > 0; i -= 3)
            whole.insert(i, QLatin1Char(','));
    const auto nonZero = [](const QString& digits) {
        for (const QChar c : digits)
            if (c >= QLatin1Char('1') && c <= QLatin1Char('9'))
                return true;
        return false;
    };
    const bool zero = !nonZero(whole) && !nonZero(frac);
    QString out = whole;
    if (s.point)
        out += QLatin1Char('.') + frac;
    return (withSign && value < 0 && !zero ? QStringLiteral("-") : QString()) + s.prefix + out + s.suffix;
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
    const Pattern* p = compiled(pattern).get();
    if (p->general)
        return QString::number(v, 'g', 15);
    if (v == 0 && p->hasZero)
        return render(0, p->zero, false);
    if (v < 0 && p->hasNegative)
        return render(-v, p->negative, false);
    return render(v, p->positive, true);
}

} // namespace tagora
