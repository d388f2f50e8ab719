#include "labels/itemlist.h"

#include "erp/textconv.h"
#include "labels/numberformat.h"
#include "labels/pagewriter.h"
#include "localdb/database.h"
#include "platform/progress.h"

#include <QDate>
#include <QDateTime>
#include <QDir>

#include <cmath>

namespace tagora {

namespace {
// Dates reach the local databases as "yyyy-MM-dd HH:mm:ss" text; a number is
// a day serial. Text that is no date is shown as it is.
QString listDate(const QVariant& value)
{
    const QString format = QStringLiteral("dd/MM/yy");
    switch (value.metaType().id()) {
    case QMetaType::QDate:
        return value.toDate().toString(format);
    case QMetaType::QDateTime:
        return value.toDateTime().date().toString(format);
    case QMetaType::Int:
    case QMetaType::LongLong:
    case QMetaType::Double: {
        const double d = value.toDouble();
        if (std::isfinite(d) && std::fabs(d) < 3e6)
            return serialToDate((long long)std::floor(d)).toString(format);
        return value.toString();
    }
    default:
        break;
    }
    const QString text = value.toString().trimmed();
    const QDate day = QDate::fromString(text.left(10), QStringLiteral("yyyy-MM-dd"));
    if (day.isValid() && (text.size() == 10 || text[10] == QLatin1Char(' ') || text[10] == QLatin1Char('T')))
        return day.toString(format);
    return value.toString();
}
} // namespace

QString ItemListCell(const QVariant& value, const QString& kind, const QString& priceFormat)
{
    if (!value.isValid() || value.isNull())
        return QString();
    if (kind == QLatin1String("2"))
        return FormatNumber(value, priceFormat);
    if (kind == QLatin1String("3"))
        return listDate(value);
    return value.toString();
}

QString CreateItemListPage(const QString& fileName, const QString& dbPath, const QString& sql,
                           const QVector<ItemListColumn>& columns, const QString& priceFormat,
                           ProgressSink* progress)
{
    const QString format = priceFormat.trimmed().isEmpty() ? QStringLiteral("0.00") : priceFormat.trimmed();
    const QString shown = QDir::toNativeSeparators(fileName);
    PageWriter out(fileName);
    if (!out.open())
        return QStringLiteral("לא ניתן ליצור את הקובץ '%1'").arg(shown);
    const QString writeFailed = QStringLiteral("כתיבת הקובץ '%1' נכשלה (ייתכן שהדיסק מלא)").arg(shown);
    for (const char* head : {"<HTML>", "<HEAD>", "<TITLE>רשימת פריטים להדפסה</TITLE>",
                             "<meta http-equiv='Content-Type' content='text/html; charset=windows-1255'>", "<style>",
                             " .Title1 {font-size : 9pt; color: blue; font-family: Arial; font-weight : bold;}",
                             " .TDCaption {font-size : 8pt; color: white; background: blue; font-family: Arial; "
                             "font-weight : bold;}",
                             " TD {font-size : 8pt; color: black; font-family: Arial; text-align:right}",
                             " TR {text-align:right}", "</style>", "</HEAD>", "<BODY BGCOLOR='#FFFFFF'>"})
        out.line(QString::fromUtf8(head));

    Database db;
    DbError e = db.open(dbPath, Database::OpenMode::ReadOnly);
    // The records are counted first, for the progress bar.
    long long total = 0;
    if (!e) {
        Statement first = db.prepare(sql, &e);
        Statement::Step s = Statement::Step::Done;
        while (!e && (s = first.step()) == Statement::Step::Row)
            ++total;
        if (!e && s == Statement::Step::Error)
            e = first.error();
    }
    // Returning without a commit drops what was written of the page.
    if (e)
        return e.message;
    if (total == 0)
        return out.commit() ? QString() : writeFailed;

    Statement records = db.prepare(sql, &e);
    if (e)
        return e.message;
    QVector<int> at;
    for (const ItemListColumn& c : columns) {
        at << records.columnIndex(c.column);
        if (at.last() < 0)
            return QStringLiteral("העמודה %1 אינה ברשומת המדבקה").arg(c.column);
    }
    const int copiesColumn = records.columnIndex(QStringLiteral("Copies"));
    if (copiesColumn < 0)
        return QStringLiteral("העמודה Copies אינה ברשומת המדבקה");
    if (progress)
        progress->setProgress(0);

    out.line(QStringLiteral("<p class=Title1 align='center'>רשימת פריטים ונתונים להדפסה</p>"));
    out.line(QStringLiteral("<table width='100%' border='0' cellpadding='1' cellspacing='1' dir='rtl'>"));
    out.line(QStringLiteral(" <tr>"));
    for (const ItemListColumn& c : columns)
        out.line(QStringLiteral("  <td class=TDCaption>") + HtmlText(c.caption) + QStringLiteral("</td>"));
    out.line(QStringLiteral("  <td class=TDCaption>עותקים</td>"));
    out.line(QStringLiteral(" </tr>"));

    long long done = 0;
    Statement::Step s;
    while (!out.failed() && (s = records.step()) == Statement::Step::Row) {
        out.line(QStringLiteral(" <tr>"));
        for (int i = 0; i < columns.size(); ++i)
            out.line(QStringLiteral("  <td>") + HtmlText(ItemListCell(records.value(at[i]), columns[i].kind, format))
                     + QStringLiteral("</td>"));
        out.line(QStringLiteral("  <td>") + QString::number(NullToInteger(records.value(copiesColumn)))
                 + QStringLiteral("</td>"));
        out.line(QStringLiteral(" </tr>"));
        if (progress && ++done % 20 == 0)
            progress->setProgress(double(done) / double(total));
    }
    if (progress)
        progress->setProgress(0);
    if (!out.failed() && s == Statement::Step::Error)
        return records.error().message;
    out.line(QStringLiteral("</table>"));
    out.line(QStringLiteral("</BODY>"));
    out.line(QStringLiteral("</HTML>"));
    return out.commit() ? QString() : writeFailed;
}

} // namespace tagora
