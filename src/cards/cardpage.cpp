#include "cards/cardpage.h"

#include "labels/directlabels.h"
#include "platform/pageviewer.h"

#include <QDir>

namespace tagora {

namespace {
const QString kMeta = QStringLiteral("<meta http-equiv='Content-Type' content='text/html; charset=windows-1255'>");
const QString kCompany = QStringLiteral("ונמר מערכות מידע");

QString cellTag(const QString& attributes)
{
    return attributes.isEmpty() ? QStringLiteral("     <td>") : QStringLiteral("     <td %1>").arg(attributes);
}

QString cantWrite(const QString& path)
{
    return QStringLiteral("לא ניתן לכתוב את הקובץ %1").arg(QDir::toNativeSeparators(path));
}

// The small framed page of the waiting and the error pages.
QString writeFramePage(const QString& path, const QStringList& head, const QStringList& rows)
{
    PageWriter out(path);
    if (!out.open())
        return cantWrite(path);
    out.line(QStringLiteral("<HTML>"));
    out.line(QStringLiteral("<HEAD>"));
    out.line(QStringLiteral("<TITLE>") + kCompany + QStringLiteral("</TITLE>"));
    out.line(kMeta);
    for (const QString& l : head)
        out.line(l);
    out.line(QStringLiteral("</HEAD>"));
    out.line(QStringLiteral("<BODY>"));
    out.line(QStringLiteral("<table class=Frame align='center' width='60%'>"));
    for (const QString& r : rows)
        out.line(QStringLiteral(" <tr><td align='center'>") + r + QStringLiteral("</td></tr>"));
    out.line(QStringLiteral("</table>"));
    out.line(QStringLiteral("</BODY>"));
    out.line(QStringLiteral("</HTML>"));
    return out.commit() ? QString() : cantWrite(path);
}
} // namespace

QString CardPagePath(const char* fileName)
{
    const QString folder = UserTempFolder();
    QDir().mkpath(folder);
    return QDir(folder).filePath(QLatin1String(fileName));
}

QString CardCell(const QString& text)
{
    return text.isEmpty() ? QStringLiteral("&nbsp;") : HtmlText(text);
}

QString WriteCardWaitPage(const QString& path, const QString& colour, bool reloads)
{
    QStringList head;
    if (reloads)
        head << QLatin1String(kPageReloadMeta);
    head << QStringLiteral("<style>")
         << QStringLiteral("  BODY {direction:rtl; background:#FFFFFF; margin-top:10;}")
         << QStringLiteral("  .Frame {border: thin solid %1;}").arg(colour)
         << QStringLiteral("  TD {text-align: center}")
         << QStringLiteral("  .Title1 {font-size : 12pt; color: %1; font-family: arial; font-weight : bold;}").arg(colour)
         << QStringLiteral("</style>");
    return writeFramePage(path, head, {QStringLiteral("<span class=Title1>אוסף נתונים. נא להמתין...</span>")});
}

QString WriteCardErrorPage(const QString& path, const QString& message)
{
    const QStringList head{
        QStringLiteral("<style>"),
        QStringLiteral("  BODY {direction:rtl; background:#FFFFFF; margin-top:10;}"),
        QStringLiteral("  .Frame {border: thin solid #FF0000;}"),
        QStringLiteral("  TD {font-size : 9pt; font-family: arial; text-align: center}"),
        QStringLiteral("  .Title1 {font-size : 11pt; color: #FF0000; font-family: arial; font-weight : bold;}"),
        QStringLiteral("</style>")};
    return writeFramePage(path, head,
                          {QStringLiteral("<span class=Title1>התגלתה תקלה בקריאת הנתונים. להלן הודעת השגיאה:</span>"),
                           CardCell(message),
                           QStringLiteral("<input type='button' value='סגור' onclick='window.close()'>")});
}

bool CardPage::begin(const QStringList& styleLines, const QString& titleRow)
{
    if (!m_out.open())
        return false;
    m_out.line(QStringLiteral("<HTML>"));
    m_out.line(QStringLiteral("<HEAD>"));
    m_out.line(QStringLiteral("<TITLE>נתוני פריט</TITLE>"));
    m_out.line(kMeta);
    m_out.line(QStringLiteral("<style>"));
    for (const QString& l : styleLines)
        m_out.line(l);
    m_out.line(QStringLiteral("</style>"));
    m_out.line(QStringLiteral("</HEAD>"));
    m_out.line(QStringLiteral("<BODY>"));
    m_out.line(QStringLiteral("<table class=TblClean width='100%' cellpadding='0' cellspacing='0'>"));
    m_out.line(QStringLiteral(" <tr><td class=Title1 colspan=2>") + HtmlText(titleRow) + QStringLiteral("</td></tr>"));
    return true;
}

void CardPage::captionTable(const QStringList& captions, const QStringList& cells, const QStringList& cellAttributes)
{
    m_out.line(QStringLiteral("   <table width='100%'>"));
    m_out.line(QStringLiteral("    <tr>"));
    for (const QString& c : captions)
        m_out.line(QStringLiteral("     <td class=Cap>") + HtmlText(c) + QStringLiteral("</td>"));
    m_out.line(QStringLiteral("    </tr>"));
    m_out.line(QStringLiteral("    <tr>"));
    for (qsizetype i = 0; i < cells.size(); ++i)
        m_out.line(cellTag(cellAttributes.value(i)) + cells[i] + QStringLiteral("</td>"));
    m_out.line(QStringLiteral("    </tr>"));
    m_out.line(QStringLiteral("   </table>"));
}

void CardPage::listSection(const QString& caption, const QStringList& columns, const QVector<QStringList>& rows)
{
    listSection(caption, columns, rows, {});
}

void CardPage::listSection(const QString& caption, const QStringList& columns, const QVector<QStringList>& rows,
                           const QStringList& cellAttributes)
{
    if (rows.isEmpty())
        return;
    m_out.line(QStringLiteral(" <tr><td colspan=2 class=GCap>") + HtmlText(caption) + QStringLiteral("</td></tr>"));
    m_out.line(QStringLiteral(" <tr><td colspan=2>"));
    m_out.line(QStringLiteral("   <table width='100%'>"));
    m_out.line(QStringLiteral("    <tr>"));
    for (const QString& c : columns)
        m_out.line(QStringLiteral("     <td class=Cap>") + HtmlText(c) + QStringLiteral("</td>"));
    m_out.line(QStringLiteral("    </tr>"));
    for (const QStringList& row : rows) {
        m_out.line(QStringLiteral("    <tr>"));
        for (int i = 0; i < row.size(); ++i) {
            m_out.line(cellTag(cellAttributes.value(i)) + row[i] + QStringLiteral("</td>"));
        }
        m_out.line(QStringLiteral("    </tr>"));
    }
    m_out.line(QStringLiteral("   </table>"));
    m_out.line(QStringLiteral(" </td></tr>"));
}

QString CardPage::finish()
{
    m_out.line(QStringLiteral("</table>"));
    m_out.line(QStringLiteral("<p class=Venmar align='center'>") + kCompany + QStringLiteral("</p>"));
    m_out.line(QStringLiteral("</BODY>"));
    m_out.line(QStringLiteral("</HTML>"));
    return m_out.commit() ? QString() : QStringLiteral("לא ניתן לכתוב את כרטיס הפריט");
}

} // namespace tagora
