#include "cards/tagorainfo.h"

#include "cards/cardpage.h"
#include "labels/numberformat.h"
#include "localdb/database.h"
#include "platform/pageviewer.h"
#include "platform/prompt.h"

#include <QFile>
#include <functional>

namespace tagora {

namespace {
const QString kColour = QStringLiteral("#287B00");
const QString kPrice = QStringLiteral("#,##0.00");

// Keys are compared as the items database compares them, without regard to
// case, whatever collation a copied or older file gives its columns.
const QString kItemSql = QStringLiteral(
    "SELECT Itm.ItemKey, Itm.ItemName, Itm.ItemSort AS SortGroup"
    ", Itm.Filter, Itm.Fname AS ForignName, Itm.Unit AS SalesUnit"
    ", Itm.Weight"
    ", Itm.Local AS Localization, Itm.BarCode"
    ", Itm.Price, Itm.Coin AS Curr1"
    " FROM tItems Itm"
    " WHERE Itm.ItemKey = ?1 COLLATE NOCASE");
const QString kPriceListSql = QStringLiteral(
    "SELECT PL.PriceList AS PriceListNumber, PLN.PLName AS PriceName"
    ", PL.Price AS LastPrice, PL.Currency AS LastCurrency"
    " FROM tPriceList PL, tPLName PLN"
    " WHERE NOT (PL.Price IS NULL)"
    " AND PLN.PLID = PL.PriceList"
    " AND PL.ItemKey = ?1 COLLATE NOCASE"
    " ORDER BY PL.PriceList");
const QString kSpecialPriceSql = QStringLiteral(
    "SELECT AP.AccountKey"
    ", AP.Price, AP.Coin AS CurrencyCode"
    " FROM tAlterPrices AP"
    " WHERE AP.ItemKey = ?1 COLLATE NOCASE"
    " ORDER BY AP.AccountKey");
const QString kAlterKeySql = QStringLiteral(
    "SELECT AK.AccountKey, AK.AlterNum AS AlterKey"
    ", AK.AlterBar"
    " FROM tAlterKeys AK"
    " WHERE AK.ItemKey = ?1 COLLATE NOCASE"
    " ORDER BY AK.AccountKey");
// The account's second label stands in the suffix column: the items database
// keeps no suffix, and the second label is what an account adds to an item's
// own label.
const QString kAccountDefSql = QStringLiteral(
    "SELECT AD.AccountKey, AD.PriceList"
    ", AD.LabelName, AD.Label2Name"
    " FROM tAccountDef AD"
    " WHERE AD.AccountKey = ?1 COLLATE NOCASE"
    " ORDER BY AD.DefID");

QString cell(const Statement& row, const char* column)
{
    return CardCell(row.value(QLatin1String(column)).toString());
}

QString price(const Statement& row, const char* column)
{
    return CardCell(FormatNumber(row.value(QLatin1String(column)), kPrice));
}

// The rows of one section's query, each made into cells; empty text, or why
// the query failed.
QString readRows(const Database& db, const QString& sql, const QString& key,
                 const std::function<QStringList(const Statement&)>& cells, QVector<QStringList>* rows)
{
    DbError e;
    Statement st = db.prepare(sql, &e);
    if (e || !st.isValid())
        return e.message.isEmpty() ? QStringLiteral("לא ניתן לקרוא את נתוני הפריט") : e.message;
    if (!st.bind(1, key))
        return st.error().message;
    for (;;) {
        switch (st.step()) {
        case Statement::Step::Row:
            rows->append(cells(st));
            break;
        case Statement::Step::Done:
            return QString();
        case Statement::Step::Error:
            return st.error().message;
        }
    }
}
} // namespace

TagoraInfo::TagoraInfo(QObject* parent)
    : TagoraInfo(std::make_shared<DesktopPageViewer>(), std::make_shared<MessageBoxPrompt>(nullptr), parent)
{
}

TagoraInfo::TagoraInfo(std::shared_ptr<PageViewer> pages, std::shared_ptr<Prompt> prompt, QObject* parent)
    : QObject(parent)
    , m_pages(std::move(pages))
    , m_prompt(std::move(prompt))
{
}

TagoraInfo::~TagoraInfo() = default;

void TagoraInfo::OpenItemHTML(const QString& pItemCode, const QString& pDBName, const QString& pAccountKey)
{
    const QString code = pItemCode.trimmed();
    const QString wait = CardPagePath(cardfiles::Wait);
    if (const QString why = WriteCardWaitPage(wait, kColour, true); !why.isEmpty()) {
        m_prompt->critical(titles::Fault, why);
        return;
    }
    const QString card = CardPagePath(cardfiles::LocalCard);
    QString error;
    const bool shown = ShowPageAfterWaitPage(
        *m_pages, wait,
        [&]() -> QString {
            const QString why = writeCard(card, code, pDBName, pAccountKey);
            if (why.isEmpty())
                return card;
            // The window keeps the waiting page; one that still reloaded
            // would go on reloading for as long as the window is open.
            WriteCardWaitPage(wait, kColour, false);
            m_prompt->critical(titles::Fault, why);
            return QString();
        },
        &error);
    if (!shown)
        m_prompt->critical(titles::Fault, error);
}

bool TagoraInfo::CreateItemHTML(const QString& pFileName, const QString& pItemCode, const QString& pDBName,
                                const QString& pAccountKey)
{
    const QString why = writeCard(pFileName, pItemCode, pDBName, pAccountKey);
    if (why.isEmpty())
        return true;
    m_prompt->critical(titles::Fault, why);
    return false;
}

QStringList TagoraInfo::CreateHTMLStyle() const
{
    return {
        QStringLiteral("  BODY {direction:rtl; background:#FFFFFF ;margin-top:10; margin-left:10; margin-right:10; "
                       "vertical-align:top;}"),
        QStringLiteral("  TABLE {border: thin solid #287B00; padding: 2 2 2 2; border-spacing: 2; border-collapse: seperate}"),
        QStringLiteral("  TD {font-size : 9pt; color: black; font-family: arial; text-align: right}"),
        QStringLiteral("  A {text-decoration: none}"),
        QStringLiteral("  .TblClean {border: none}"),
        QStringLiteral("  .Cap {background:#669999; font-size : 9pt; color: white; font-family: Arial; font-weight: bold}"),
        QStringLiteral("  .GCap {font-size : 9pt; color: #287B00; font-family: Arial; font-weight: bold}"),
        QStringLiteral("  .Title1 {font-size : 10pt; color: #287B00; font-family: arial; font-weight : bold;}"),
        QStringLiteral("  .Venmar {font-size : 8pt; color: black; font-family: arial;}"),
    };
}

QString TagoraInfo::writeCard(const QString& fileName, const QString& itemCode, const QString& dbName,
                              const QString& accountKey)
{
    // A card of an earlier call is no card of this item: it goes with the
    // failure rather than stay where a host would look for this one.
    const auto failed = [&fileName](const QString& why) {
        QFile::remove(fileName);
        return why;
    };
    Database db;
    if (DbError e = db.open(dbName, Database::OpenMode::ReadOnly))
        return failed(e.message);

    QVector<QStringList> item;
    QString why = readRows(db, kItemSql, itemCode,
                           [](const Statement& r) -> QStringList {
                               return {QStringLiteral("<b>") + cell(r, "ItemKey") + QStringLiteral("</b>"),
                                       cell(r, "ItemName"),
                                       cell(r, "SortGroup"),
                                       cell(r, "BarCode"),
                                       cell(r, "SalesUnit"),
                                       cell(r, "ForignName"),
                                       cell(r, "Weight")};
                           },
                           &item);
    // Every section is read before the page is begun, so a query that fails
    // leaves nothing half-made behind.
    QVector<QStringList> prices, special, alterKeys, definitions;
    if (why.isEmpty() && !item.isEmpty()) {
        why = readRows(db, kPriceListSql, itemCode,
                       [](const Statement& r) -> QStringList {
                           return {cell(r, "PriceName"), price(r, "LastPrice"), cell(r, "LastCurrency")};
                       },
                       &prices);
        if (why.isEmpty())
            why = readRows(db, kSpecialPriceSql, itemCode,
                           [](const Statement& r) -> QStringList {
                               return {cell(r, "AccountKey"), price(r, "Price"), cell(r, "CurrencyCode")};
                           },
                           &special);
        if (why.isEmpty())
            why = readRows(db, kAlterKeySql, itemCode,
                           [](const Statement& r) -> QStringList {
                               return {cell(r, "AccountKey"), cell(r, "AlterKey"), cell(r, "AlterBar")};
                           },
                           &alterKeys);
        if (why.isEmpty() && !accountKey.isEmpty())
            why = readRows(db, kAccountDefSql, accountKey,
                           [](const Statement& r) -> QStringList {
                               return {cell(r, "AccountKey"), cell(r, "PriceList"), cell(r, "LabelName"),
                                       cell(r, "Label2Name")};
                           },
                           &definitions);
    }
    db.close();
    if (!why.isEmpty())
        return failed(why);

    CardPage page(fileName);
    if (!page.begin(CreateHTMLStyle(), QStringLiteral("כרטיס פריט - תגורה של ונמר")))
        return failed(QStringLiteral("לא ניתן לכתוב את כרטיס הפריט"));
    if (!item.isEmpty()) {
        const QStringList& i = item.first();
        page.line(QStringLiteral(" <tr><td colspan=2>"));
        page.captionTable({QStringLiteral("מפתח פריט"), QStringLiteral("שם פריט"), QStringLiteral("מיון"),
                           QStringLiteral("ברקוד")},
                          i.mid(0, 4));
        page.captionTable({QStringLiteral("יח מידה"), QStringLiteral("שם לועזי"), QStringLiteral("משקל")}, i.mid(4));
        page.line(QStringLiteral(" </td></tr>"));
        const QString accountCaption = QStringLiteral("מפתח חשבון");
        page.listSection(QStringLiteral("מחירונים"),
                         {QStringLiteral("מחירון"), QStringLiteral("מחיר"), QStringLiteral("מטבע")}, prices);
        page.listSection(QStringLiteral("מחירים מיוחדים"), {accountCaption, QStringLiteral("מחיר"), QStringLiteral("מטבע")},
                         special);
        page.listSection(QStringLiteral("מפתחות חליפיים"),
                         {accountCaption, QStringLiteral("מפתח חליפי"), QStringLiteral("ברקוד חליפי")}, alterKeys);
        // The second label's file name is Latin text: it reads left to right.
        page.listSection(QStringLiteral("הגדרות לקוח/ספק"),
                         {accountCaption, QStringLiteral("מחירון"), QStringLiteral("מדבקה"), QStringLiteral("סיומת")},
                         definitions, {QString(), QString(), QString(), QStringLiteral("dir=ltr")});
    }
    if (const QString e = page.finish(); !e.isEmpty())
        return failed(e);
    return QString();
}

} // namespace tagora
