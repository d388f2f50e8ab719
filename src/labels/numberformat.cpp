#include "labels/numberformat.h"

#include <QRegularExpression>
#include <QStringList>
#include <cmath>

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
    const bool zero = !(whole + frac).contains(QRegularExpression(QStringLiteral("[1-9]")));
    QString out = whole;
    if (s.point)
        out += QLatin1Char('.') + frac;
    return (withSign && value < 0 && !zero ? QStringLiteral("-") : QString()) + s.prefix + out + s.suffix;
}
} // namespace

QString FormatNumber(const QVariant& value, const QString& pattern)
{
    if (!value.isValid() || value.isNull())
        return QString();
    bool ok = false;
    const double v = value.toString().trimmed().toDouble(&ok);
    if (!ok || !std::isfinite(v))
        return value.toString();
    const QString p = named(pattern);
    if (p.trimmed().isEmpty() || p.trimmed().compare(QLatin1String("general number"), Qt::CaseInsensitive) == 0)
        return QString::number(v, 'g', 15);
    const QStringList parts = sections(p);
    if (v == 0 && parts.size() >= 3 && !parts[2].isEmpty())
        return render(0, parse(parts[2]), false);
    if (v < 0 && parts.size() >= 2 && !parts[1].isEmpty())
        return render(-v, parse(parts[1]), false);
    return render(v, parse(parts[0]), true);
}

} // namespace tagora
