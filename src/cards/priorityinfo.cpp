#include "cards/priorityinfo.h"

#include "cards/cardpage.h"
#include "erp/odbc.h"
#include "erp/textconv.h"
#include "labels/numberformat.h"
#include "platform/pageviewer.h"
#include "platform/prompt.h"

#include <QDir>
#include <functional>
#include <map>

namespace tagora {

namespace {

const QString kPriceFormat = QStringLiteral("#,##0.00");
const QString kQuantityFormat = QStringLiteral("#,##0.0");

// The ERP's texts are converted by the connection type the card reads with,
// which need not be the one the rest of the process last set.
class ConnTypeScope {
public:
    explicit ConnTypeScope(short type) : m_saved(erpConnType()) { setErpConnType(type); }
    ~ConnTypeScope() { setErpConnType(m_saved); }
    ConnTypeScope(const ConnTypeScope&) = delete;
    ConnTypeScope& operator=(const ConnTypeScope&) = delete;

private:
    short m_saved;
};

// An ERP text as a cell: converted, escaped, "&nbsp;" when there is none.
QString textCell(const QVariant& value) { return CardCell(ConvertErpText(value, QString())); }
// A code or a whole number as a cell: as the ERP holds it, escaped.
QString codeCell(const QVariant& value) { return CardCell(value.isNull() ? QString() : value.toString()); }
QString numberCell(const QVariant& value, const QString& format) { return CardCell(FormatNumber(value, format)); }

// The rows of one of the card's optional sections. A query the ERP cannot
// answer (a table this ERP lacks, say) gives no rows: the section is left
// out and the card goes on.
QVector<QStringList> sectionRows(ErpConnection& erp, const QString& sql, const ErpParams& params,
                                 const std::function<QStringList(const ErpRecordset&)>& row)
{
    QVector<QStringList> rows;
    QString error;
    auto rs = erp.query(sql, params, &error);
    if (!rs)
        return rows;
    while (rs->next())
        rows << row(*rs);
    if (rs->failed())
        rows.clear();
    return rows;
}

} // namespace

PriorityInfo::PriorityInfo(std::shared_ptr<PageViewer> pages, std::shared_ptr<Prompt> prompt)
    : m_pages(std::move(pages))
    , m_prompt(std::move(prompt))
{
}

void PriorityInfo::OpenItemHTML(const QString& pItemCode, const QString& pConnStr, short pConnType,
                                const QString& pConnPath)
{
    const QString code = pItemCode.trimmed();
    const QString waitPage = CardPagePath(cardfiles::Wait);
    QString error = CreateWaitHTML(waitPage);
    if (!error.isEmpty()) {
        m_prompt->critical(titles::Fault, error);
        return;
    }
    // A failure that not even the error page could tell is shown here instead.
    QString untold;
    const bool shown = ShowPageAfterWaitPage(
        *m_pages, waitPage,
        [&]() -> QString {
            const QString cardPage = CardPagePath(cardfiles::ErpCard);
            const QString why = CreateItemHTML(cardPage, code, pConnStr, pConnType, pConnPath);
            if (why.isEmpty())
                return cardPage;
            const QString errorPage = CardPagePath(cardfiles::ErpError);
            if (CreateErrorHTML(errorPage, why).isEmpty())
                return errorPage;
            // The window keeps a waiting page that no longer waits for anything.
            WriteCardWaitPage(waitPage, QStringLiteral("#5F8EBE"), false);
            untold = why;
            return QString();
        },
        &error);
    if (!shown)
        m_prompt->critical(titles::Fault, error);
    else if (!untold.isEmpty())
        m_prompt->critical(titles::Fault, untold);
}

QString PriorityInfo::pictureSource(const QString& name, const QString& connPath)
{
    if (!name.startsWith(QLatin1String("..")))
        return name;
    // The ERP names the picture from its own folder, with its own separators;
    // here they must be this system's for the browser to find the file.
    QString relative = name;
    if (QDir::separator() == QLatin1Char('/'))
        relative.replace(QLatin1Char('\\'), QLatin1Char('/'));
    if (connPath.isEmpty())
        return relative;
    QString folder = connPath;
    if (!folder.endsWith(QDir::separator()) && !folder.endsWith(QLatin1Char('/')))
        folder += QDir::separator();
    return folder + relative;
}

QString PriorityInfo::CreateItemHTML(const QString& pFileName, const QString& pItemCode, const QString& pConnStr,
                                     short pConnType, const QString& pConnPath)
{
    const ConnTypeScope connType(pConnType);
    ErpConnection erp;
    QString error;
    if (!erp.open(pConnStr, m_timeout, &error))
        return error;

    auto item = erp.query(QStringLiteral("SELECT PART.PART, PART.PARTNAME AS ItemKey"
                                         ", PART.PARTDES As ItemName"
                                         ", FAMILY.FAMILYNAME As SortGroup"
                                         ", FAMILY.FAMILYDES As SortCodeName"
                                         ", UNIT.UNITNAME As Unit"
                                         ", PART.BARCODE"
                                         ", PARTDES.EPARTDES As ForignName"
                                         ", SUPPLIERS.SUPDES"
                                         " FROM PART, FAMILY, UNIT, PARTDES, PARTPARAM, SUPPLIERS"
                                         " WHERE PART.PARTNAME = ?"
                                         " AND (PART.TYPE = 'R' OR PART.TYPE = 'P')"
                                         " AND FAMILY.FAMILY = PART.FAMILY"
                                         " AND UNIT.UNIT = PART.UNIT"
                                         " AND PARTDES.PART = PART.PART"
                                         " AND PARTPARAM.PART = PART.PART"
                                         " AND SUPPLIERS.SUP = PARTPARAM.SUP"),
                          ErpParams{pItemCode}, &error);
    if (!item)
        return error;
    // The row is kept and the recordset let go before the sections' queries:
    // a server may serve one open result at a time on a connection.
    QVariantList itemRow;
    if (item->next())
        for (int i = 0; i < item->columnCount(); ++i)
            itemRow << item->value(i);
    if (item->failed())
        return item->error();
    item.reset();

    CardPage page(pFileName);
    if (!page.begin(CreateHTMLStyle(), QStringLiteral("כרטיס פריט - פריוריטי/זום")))
        return QStringLiteral("לא ניתן לכתוב את כרטיס הפריט");
    if (!itemRow.isEmpty())
        writeItem(page, erp, itemRow, pConnPath);
    return page.finish();
}

void PriorityInfo::writeItem(CardPage& page, ErpConnection& erp, const QVariantList& item, const QString& connPath)
{
    const QVariant id = item.value(0);
    const QVariant today = DateToErp(QVariant(m_today.isValid() ? m_today : QDate::currentDate()), erpConnType());
    const ErpParams byId{id};
    const ErpParams byIdToday{id, today, today};

    page.line(QStringLiteral(" <tr>"));
    page.line(QStringLiteral("  <td valign=top width='50%'>"));
    const QString family = CardCell(ConvertErpText(item.value(3), QString()) + QStringLiteral(" - ")
                                    + ConvertErpText(item.value(4), QString()));
    page.captionTable({QStringLiteral("מקט"), QStringLiteral("תאור פריט"), QStringLiteral("משפחת מוצר"),
                       QStringLiteral("ברקוד")},
                      {QStringLiteral("<b>") + codeCell(item.value(1)) + QStringLiteral("</b>"),
                       textCell(item.value(2)), family, codeCell(item.value(6))});
    page.captionTable({QStringLiteral("יח מידה"), QStringLiteral("שם לועזי"), QStringLiteral("ספק מועדף")},
                      {textCell(item.value(5)), textCell(item.value(7)), textCell(item.value(8))},
                      {QString(), QStringLiteral("class=TDEng dir=ltr"), QString()});

    const auto pictures = sectionRows(erp,
                                      QStringLiteral("SELECT PEF.EXTFILENAME"
                                                     " FROM PARTEXTFILE PEF"
                                                     " WHERE PEF.PART = ?"
                                                     " AND PEF.EXTFILENUM = -1"),
                                      byId, [](const ErpRecordset& rs) { return QStringList{NullTrim(rs.value(0))}; });
    if (!pictures.isEmpty() && !pictures.first().first().isEmpty()) {
        page.line(QStringLiteral("   <table class=TblClean width='100%'>"));
        page.line(QStringLiteral("    <tr>"));
        page.line(QStringLiteral("     <td width='100%' align=center><img src='")
                  + HtmlText(pictureSource(pictures.first().first(), connPath)) + QStringLiteral("' border='0'></td>"));
        page.line(QStringLiteral("    </tr>"));
        page.line(QStringLiteral("   </table>"));
    }
    page.line(QStringLiteral("  </td>"));

    page.line(QStringLiteral("  <td valign=top width='50%'>"));
    page.line(QStringLiteral("   <table width='100%'>"));
    page.line(QStringLiteral("    <tr><td class=Cap colspan=2>תאורים ופרמטרים נוספים</td></tr>"));
    writeParameters(page, erp, byId);
    const auto textSection = [&](const QString& table, const QString& caption, const QString& cellClass) {
        const auto lines = sectionRows(erp,
                                       QStringLiteral("SELECT PT.TEXT FROM ") + table
                                           + QStringLiteral(" PT WHERE PT.PART = ? ORDER BY PT.TEXTORD"),
                                       byId, [](const ErpRecordset& rs) { return QStringList{textCell(rs.value(0))}; });
        if (lines.isEmpty())
            return;
        page.line(QStringLiteral("    <tr><td class=GCap colspan=2>") + caption + QStringLiteral("</td></tr>"));
        for (const QStringList& l : lines)
            page.line(QStringLiteral("    <tr><td colspan=2") + cellClass + QLatin1Char('>') + l.first()
                      + QStringLiteral("</td></tr>"));
    };
    textSection(QStringLiteral("PARTTEXT"), QStringLiteral("תאור בעברית:"), QString());
    // Latin text runs left to right: in the page's right-to-left flow its
    // closing full stop would otherwise land at the start of the line.
    textSection(QStringLiteral("PARTTEXTLANG"), QStringLiteral("תאור באנגלית:"), QStringLiteral(" class=TDEng dir=ltr"));
    page.line(QStringLiteral("   </table>"));
    page.line(QStringLiteral("  </td>"));
    page.line(QStringLiteral(" </tr>"));

    const QString customerKey = QStringLiteral("מפתח לקוח");
    const QString customerName = QStringLiteral("שם לקוח");
    const QString price = QStringLiteral("מחיר");
    const QString currency = QStringLiteral("מטבע");
    const QString alterKey = QStringLiteral("מפתח חליפי");

    page.listSection(QStringLiteral("מחירונים"), {QStringLiteral("מחירון"), price, currency},
                     sectionRows(erp,
                                 QStringLiteral("SELECT PP.PLIST, PL.PLNAME AS PriceName"
                                                ", PP.PRICE As LastPrice, CR.CODE As LastCurrency"
                                                " FROM CURRENCIES CR, PARTPRICE PP, PRICELIST PL"
                                                " WHERE PP.PART = ?"
                                                " AND CR.CURRENCY = PP.CURRENCY"
                                                " AND PL.PLIST = PP.PLIST"
                                                " AND Not (PP.PRICE Is Null)"
                                                " ORDER BY PP.PLIST"),
                                 byId, [](const ErpRecordset& rs) {
                                     return QStringList{textCell(rs.value(1)), numberCell(rs.value(2), kPriceFormat),
                                                        codeCell(rs.value(3))};
                                 }));

    page.listSection(QStringLiteral("מחירים מיוחדים"), {customerKey, customerName, price, currency},
                     sectionRows(erp,
                                 QStringLiteral("SELECT C.CUSTNAME As AccountKey, C.CUSTDES As FullName"
                                                ", CPP.PRICE, CR.CODE As CurrencyCode"
                                                " FROM CUSTOMERS C, CUSTPARTPRICE CPP, CURRENCIES CR"
                                                " WHERE CPP.PART = ?"
                                                " AND CPP.EXPIRYDATE >= ?"
                                                " AND CPP.FROMDATE <= ?"
                                                " AND C.CUST = CPP.CUST"
                                                " AND CR.CURRENCY = CPP.CURRENCY"
                                                " ORDER BY C.CUSTNAME"),
                                 byIdToday, [](const ErpRecordset& rs) {
                                     return QStringList{codeCell(rs.value(0)), textCell(rs.value(1)),
                                                        numberCell(rs.value(2), kPriceFormat), codeCell(rs.value(3))};
                                 }));

    const auto accountKeyRow = [](const ErpRecordset& rs) {
        return QStringList{codeCell(rs.value(0)), textCell(rs.value(1)), codeCell(rs.value(2))};
    };
    page.listSection(QStringLiteral("מפתחות חליפיים"), {customerKey, customerName, alterKey},
                     sectionRows(erp,
                                 QStringLiteral("SELECT C.CUSTNAME AS AccountKey, C.CUSTDES AS FullName"
                                                ", CP.CUSTPARTNAME AS AlterKey"
                                                " FROM CUSTOMERS C, CUSTPART CP"
                                                " WHERE CP.PART = ?"
                                                " AND C.CUST = CP.CUST"
                                                " AND Not (CP.CUSTPARTNAME Is Null)"
                                                " ORDER BY C.CUSTNAME"),
                                 byId, accountKeyRow));
    page.listSection(QStringLiteral("מפתחות חליפיים ספקים"),
                     {QStringLiteral("מפתח ספק"), QStringLiteral("שם ספק"), alterKey},
                     sectionRows(erp,
                                 QStringLiteral("SELECT S.SUPNAME AS AccountKey, S.SUPDES AS FullName"
                                                ", SP.SUPPARTNAME AS AlterKey"
                                                " FROM SUPPLIERS S, SUPPART SP"
                                                " WHERE SP.PART = ?"
                                                " AND S.SUP = SP.SUP"
                                                " AND Not (SP.SUPPARTNAME Is Null)"
                                                " ORDER BY S.SUPNAME"),
                                 byId, accountKeyRow));

    page.listSection(QStringLiteral("פריטים חלופיים"),
                     {QStringLiteral("מקט חליפי"), QStringLiteral("תאור מוצר"), QStringLiteral("מוצר אב"),
                      QStringLiteral("תאור מוצר אב")},
                     sectionRows(erp,
                                 QStringLiteral("SELECT ALTP.PARTNAME AS AlterItem, ALTP.PARTDES As AlterName"
                                                ", PARNTP.PARTNAME AS ParItem, PARNTP.PARTDES As ParName"
                                                " FROM PARTALT PA, PART ALTP, PART PARNTP"
                                                " WHERE PA.PART = ?"
                                                " AND ALTP.PART = PA.ALT"
                                                " AND PARNTP.PART = PA.PARENT"
                                                " ORDER BY PA.LN"),
                                 byId, [](const ErpRecordset& rs) {
                                     return QStringList{codeCell(rs.value(0)), textCell(rs.value(1)),
                                                        codeCell(rs.value(2)), textCell(rs.value(3))};
                                 }));

    page.listSection(QStringLiteral("עצי מוצר"),
                     {QStringLiteral("כמות האב"), QStringLiteral("מקט הבן"), QStringLiteral("שם הבן"),
                      QStringLiteral("כמות הבן")},
                     sectionRows(erp,
                                 QStringLiteral("SELECT P.PARTNAME AS ItemKey, P.PARTDES AS ItemName"
                                                ", PA.COEF AS Quantity, PA.SONQUANT"
                                                " FROM PARTARC PA, PART P"
                                                " WHERE PA.PART = ?"
                                                " AND P.PART = PA.SON"
                                                " AND PA.TILLDATE >= ?"
                                                " AND PA.FROMDATE <= ?"
                                                " ORDER BY P.PARTNAME"),
                                 byIdToday, [](const ErpRecordset& rs) {
                                     return QStringList{numberCell(rs.value(2), kQuantityFormat), codeCell(rs.value(0)),
                                                        textCell(rs.value(1)), numberCell(rs.value(3), kQuantityFormat)};
                                 }));
}

void PriorityInfo::writeParameters(CardPage& page, ErpConnection& erp, const QVariantList& byId)
{
    // Only numbers read as whole numbers name a column: nothing else the ERP
    // returns reaches the query's text.
    std::map<qlonglong, QString> names;
    for (const QStringList& r : sectionRows(erp,
                                            QStringLiteral("SELECT PST.NUMBER, PST.SPECDES"
                                                           " FROM PARTSPECTYPES PST"
                                                           " WHERE PST.NUMBER > 0"
                                                           " ORDER BY PST.NUMBER"),
                                            {}, [](const ErpRecordset& rs) {
                                                return QStringList{rs.value(0).toString(),
                                                                   ConvertErpText(rs.value(1), QString())};
                                            })) {
        bool ok = false;
        const qlonglong n = r[0].trimmed().toLongLong(&ok);
        if (ok && n > 0)
            names[n] = r[1].isEmpty() ? QStringLiteral("פרמטר ") + QString::number(n) : r[1];
    }
    if (names.empty())
        return;
    const qlonglong first = names.begin()->first;
    const qlonglong last = names.rbegin()->first;
    // The ERP names a parameter's column after its table, less the "PART"
    // in front, followed by the parameter's number.
    const QString table = QStringLiteral("PARTSPEC");
    const QString column = table.mid(4);
    QString sql = QStringLiteral("SELECT PS.PART");
    for (qlonglong n = first; n <= last; ++n)
        sql += QStringLiteral(", PS.") + column + QString::number(n);
    sql += QStringLiteral(" FROM ") + table + QStringLiteral(" PS WHERE PS.PART = ?");
    const auto values = sectionRows(erp, sql, byId, [&](const ErpRecordset& rs) {
        QStringList row;
        for (int i = 1; i < rs.columnCount(); ++i)
            row << ConvertErpText(rs.value(i), QString());
        return row;
    });
    if (values.isEmpty())
        return;
    const QStringList& row = values.first();
    for (const auto& [n, name] : names) {
        const qsizetype i = qsizetype(n - first);
        if (i >= row.size() || row[i].isEmpty())
            continue;
        page.line(QStringLiteral("    <tr><td class=GCap>") + CardCell(name + QLatin1Char(':'))
                  + QStringLiteral("</td><td>") + CardCell(row[i]) + QStringLiteral("</td></tr>"));
    }
}

QStringList PriorityInfo::CreateHTMLStyle()
{
    return {
        QStringLiteral("  BODY {direction:rtl; background:#FFFFFF ;margin-top:10; margin-left:10; margin-right:10; "
                       "vertical-align:top;}"),
        QStringLiteral("  TABLE {border: thin solid #ADD6EA; padding: 2 2 2 2; border-spacing: 2; border-collapse: "
                       "seperate}"),
        QStringLiteral("  TD {font-size : 9pt; color: black; font-family: arial; text-align: right}"),
        QStringLiteral("  .TDEng {font-size : 9pt; color: black; font-family: arial; text-align: left}"),
        QStringLiteral("  A {text-decoration: none}"),
        QStringLiteral("  .TblClean {border: none}"),
        QStringLiteral("  .Cap {background:#5F8EBE; font-size : 9pt; color: white; font-family: Arial; font-weight: "
                       "bold}"),
        QStringLiteral("  .GCap {font-size : 9pt; color: #5F8EBE; font-family: Arial; font-weight: bold}"),
        QStringLiteral("  .Title1 {font-size : 10pt; color: #5F8EBE; font-family: arial; font-weight : bold;}"),
        QStringLiteral("  .Venmar {font-size : 8pt; color: black; font-family: arial;}"),
    };
}

QString PriorityInfo::CreateWaitHTML(const QString& fileName)
{
    return WriteCardWaitPage(fileName, QStringLiteral("#5F8EBE"), true);
}

QString PriorityInfo::CreateErrorHTML(const QString& fileName, const QString& message)
{
    return WriteCardErrorPage(fileName, message);
}

} // namespace tagora
