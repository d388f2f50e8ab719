#include "labels/directlayout.h"

#include "platform/settingsstore.h"

#include <cmath>
#include <functional>
#include <limits>
#include <optional>

namespace tagora {

DirectLabelLayout& directLabelLayout()
{
    static DirectLabelLayout layout;
    return layout;
}

namespace {
// Reads a stored number the way the layout's fields take it: True/False are
// -1/0; anything that is not a number is refused.
std::optional<double> storedNumber(const QString& text)
{
    const QString t = text.trimmed();
    if (t.compare(QLatin1String("true"), Qt::CaseInsensitive) == 0)
        return -1.0;
    if (t.compare(QLatin1String("false"), Qt::CaseInsensitive) == 0)
        return 0.0;
    bool ok = false;
    const double d = t.toDouble(&ok);
    if (!ok || !std::isfinite(d))
        return std::nullopt;
    return d;
}

class Mover {
public:
    Mover(int action, SettingsStore& store)
        : m_action(action)
        , m_store(store)
    {
    }

    void section(const QString& name) { m_section = name; }

    void value(const char* key, bool& field, bool fallback)
    {
        move(key, fallback ? QStringLiteral("-1") : QStringLiteral("0"), [&] { return QString::number(field ? -1 : 0); },
             [&](const QString& t) {
                 const auto n = storedNumber(t);
                 if (n)
                     field = *n != 0;
                 return n.has_value();
             });
    }

    template <class Int> void value(const char* key, Int& field, long long fallback)
    {
        move(key, QString::number(fallback), [&] { return QString::number(field); },
             [&](const QString& t) {
                 const auto n = storedNumber(t);
                 if (!n || *n < double(std::numeric_limits<Int>::min()) || *n > double(std::numeric_limits<Int>::max()))
                     return false;
                 field = Int(std::nearbyint(*n));
                 return true;
             });
    }

    void value(const char* key, float& field, float fallback)
    {
        move(key, QString::number(double(fallback)), [&] { return QString::number(double(field)); },
             [&](const QString& t) {
                 const auto n = storedNumber(t);
                 if (n)
                     field = float(*n);
                 return n.has_value();
             });
    }

    void value(const char* key, QString& field, const QString& fallback)
    {
        move(key, fallback, [&] { return field; },
             [&](const QString& t) {
                 field = t;
                 return true;
             });
    }

private:
    void move(const char* key, const QString& fallback, const std::function<QString()>& read,
              const std::function<bool(const QString&)>& write)
    {
        if (m_action == 1)
            m_store.setValue(kSettingsApp, m_section, QLatin1String(key), read());
        else if (m_action == 2)
            write(m_store.value(kSettingsApp, m_section, QLatin1String(key)).value_or(fallback));
    }

    int m_action;
    SettingsStore& m_store;
    QString m_section;
};
} // namespace

QString CheckDirectLayout(const DirectLabelLayout& layout)
{
    // NaN fails every comparison, so "within" is asked, never "outside".
    auto outside = [](const QString& name, const char* key, double value, double low, double high) {
        if (value >= low && value <= high)
            return QString();
        return QStringLiteral("ההגדרה \"%1\" (%2) של המדבקה הישירה היא %3, ומותר %4 עד %5. "
                              "תקנו אותה בהגדרות המדבקה הישירה; לא הודפסו מדבקות.")
            .arg(name, QLatin1String(key), QString::number(value), QString::number(low), QString::number(high));
    };
    const LabelPageDef& p = layout.page;
    QString why = outside(QStringLiteral("שורות מדבקות בדף"), "PageRows", p.PageRows, 1, 100);
    if (why.isEmpty())
        why = outside(QStringLiteral("מדבקות בכל שורה"), "PageCols", p.PageCols, 1, 100);
    if (why.isEmpty())
        why = outside(QStringLiteral("שוליים עליונים למדבקה"), "LabTop", p.LabTop, -1000, 1000);
    if (why.isEmpty())
        why = outside(QStringLiteral("שוליים תחתונים למדבקה"), "LabBottom", p.LabBottom, -1000, 1000);
    bool pictures = false;
    for (int i = 0; i < kDirectLines && why.isEmpty(); ++i) {
        const LabelLineDef& l = layout.lines[size_t(i)];
        if (!l.UseCell)
            continue;
        pictures = pictures || l.ViewType == 1;
        why = outside(QStringLiteral("גודל הגופן בשורה %1").arg(i + 1), "FontSize", l.FontSize, 1, 200);
        // 0 or less leaves the line's height to the browser.
        if (why.isEmpty() && l.Height > 0)
            why = outside(QStringLiteral("גובה שורה %1").arg(i + 1), "Height", l.Height, 1, 2000);
    }
    // The bar settings make only pictures; a layout without a barcode line
    // does not answer for them. 0 or less is the usual width or height.
    const LabelBarDef& b = layout.bar;
    if (why.isEmpty() && pictures && b.BarType >= 0) {
        if (b.DimX > 0)
            why = outside(QStringLiteral("עובי קו הברקוד"), "DimX", b.DimX, 0, 0.5);
        if (why.isEmpty() && !(b.BarHeight <= 0))
            why = outside(QStringLiteral("גובה הברקוד"), "BarHeight", b.BarHeight, 0, 10);
        if (why.isEmpty() && b.UserResoX > 0)
            why = outside(QStringLiteral("רוחב תמונת הברקוד בדף"), "UserResoX", b.UserResoX, 1, 2000);
        if (why.isEmpty() && b.UserResoY > 0)
            why = outside(QStringLiteral("גובה תמונת הברקוד בדף"), "UserResoY", b.UserResoY, 1, 2000);
    }
    return why;
}

void SetGetLabelDefs(int action, DirectLabelLayout& layout, SettingsStore& store)
{
    if (action != 1 && action != 2)
        return;
    Mover m(action, store);
    for (int i = 0; i < kDirectLines; ++i) {
        LabelLineDef& l = layout.lines[size_t(i)];
        m.section(QStringLiteral("LabelDef%1").arg(i));
        m.value("UseCell", l.UseCell, false);
        m.value("FldID", l.FldID, -1);
        m.value("ViewType", l.ViewType, 0);
        m.value("Align", l.Align, 1);
        m.value("Font", l.Font, 0);
        m.value("FontSize", l.FontSize, 9);
        m.value("FontWeight", l.FontWeight, 0);
        m.value("FontUL", l.FontUL, false);
        m.value("FontItalic", l.FontItalic, false);
        m.value("Direction", l.Direction, 1);
        m.value("Prefix", l.Prefix, QString());
        m.value("Height", l.Height, 0);
        m.value("Border", l.Border, false);
    }
    LabelBarDef& b = layout.bar;
    if (b.BarType >= 0) {
        m.section(QStringLiteral("LabelBar"));
        m.value("BarType", b.BarType, 0);
        m.value("BarHeight", b.BarHeight, 0.4f);
        m.value("C128User", b.C128User, false);
        m.value("C39Ascii", b.C39Ascii, false);
        m.value("DimX", b.DimX, 0.01f);
        m.value("LeftLen", b.LeftLen, 0);
        m.value("LeftPrefix", b.LeftPrefix, QString());
        m.value("UserResoX", b.UserResoX, 100);
        m.value("UserResoY", b.UserResoY, 50);
        m.value("WideBarRatio", b.WideBarRatio, 2.2f);
        m.value("CheckDigit", b.CheckDigit, true);
        m.value("ShowDesc", b.ShowDesc, false);
    }
    LabelPageDef& p = layout.page;
    m.section(QStringLiteral("DirectLabel"));
    m.value("PageCols", p.PageCols, 4);
    m.value("PageRows", p.PageRows, 6);
    m.value("PageAutoPrint", p.PageAutoPrint, false);
    m.value("MaxTextLen", p.MaxTextLen, 0);
    m.value("LabTop", p.LabTop, 0);
    m.value("LabBottom", p.LabBottom, 0);
    if (action == 1)
        store.flush();
}

} // namespace tagora
