#include "localdb/conversions.h"

#include <cfenv>
#include <cmath>

namespace tagora {

namespace {
// A part of a typed date as a 16-bit number, rounding like the platform's
// integer conversion did; nothing for an empty or non-numeric part.
std::optional<int> datePart(const QString& text)
{
    bool ok = false;
    const double d = text.trimmed().toDouble(&ok);
    if (!ok || !std::isfinite(d))
        return std::nullopt;
    const double r = std::nearbyint(d);
    if (r < -32768 || r > 32767)
        return std::nullopt;
    return int(r);
}
} // namespace

std::optional<QDate> ParseDayMonthYear(const QString& text)
{
    const int p1 = text.indexOf(QLatin1Char('/'));
    const int p2 = text.indexOf(QLatin1Char('/'), 3);
    if (p1 < 0 || p2 < 0 || p2 <= p1)
        return std::nullopt;
    const auto day = datePart(text.left(p1));
    const auto month = datePart(text.mid(p1 + 1, p2 - p1 - 1));
    auto year = datePart(text.mid(p2 + 1));
    if (!day || !month || !year)
        return std::nullopt;
    if (*year >= 80 && *year <= 99)
        *year += 1900;
    else if (*year < 80)
        *year += 2000;
    // The month first, then the day, each rolling over as a date serial does.
    const QDate date = QDate(*year, 1, 1).addMonths(*month - 1).addDays(*day - 1);
    if (!date.isValid() || date.year() < 100 || date.year() > 9999)
        return std::nullopt;
    return date;
}

short QuantityToCopies(double quantity)
{
    if (!std::isfinite(quantity))
        return 999;
    const int saved = std::fegetround();
    std::fesetround(FE_TONEAREST);
    const double r = std::nearbyint(quantity);
    std::fesetround(saved);
    if (r > 999 || r < -999)
        return 999;
    return short(std::fabs(r));
}

QString NullToText(const QVariant& value, const QString& defaultText)
{
    if (!value.isValid() || value.isNull())
        return defaultText;
    return value.toString();
}

QString StripQuoteChars(const QVariant& value)
{
    if (!value.isValid() || value.isNull())
        return QString();
    QString out = value.toString();
    out.remove(QLatin1Char('\''));
    out.remove(QLatin1Char('"'));
    out.remove(QLatin1Char(','));
    return out;
}

} // namespace tagora
