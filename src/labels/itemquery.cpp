#include "labels/itemquery.h"

#include "localdb/conversions.h"
#include "localdb/database.h"

namespace tagora {

namespace {
QString quoted(const QString& value)
{
    QString v = value;
    v.replace(QLatin1Char('\''), QLatin1String("''"));
    return v;
}

// The expression as the query holds it: a double quote is an apostrophe.
QString expressionSql(const QString& typed)
{
    QString expression = typed;
    expression.replace(QLatin1Char('"'), QLatin1Char('\''));
    return expression;
}
} // namespace

QString CheckItemQuery(const LabelQuerySettings& s)
{
    for (int row = FirstExpressionRow; row < LabelFieldCount; ++row) {
        if (!RowIsSent(s, row) || !HoldsStatementEnd(expressionSql(s.expressions[size_t(row)])))
            continue;
        // Cut at that ';', the query would run without its conditions, or run
        // whatever the expression adds after it.
        return QStringLiteral("הביטוי בשורה \"%1\" (%2) בלשונית הנתונים הנוספים מכיל ';' שמסיים את הפקודה. "
                              "ביטוי הוא חלק מפקודה אחת: הסירו את ה-';' (בתוך מחרוזת, כמו 'a;b', הוא מותר). "
                              "לא הודפסו מדבקות.")
            .arg(QString::fromUtf8(labelField(row).description), QLatin1String(labelField(row).name));
    }
    return QString();
}

QString ItemRangeCriteria(const QString& fromItem, const QString& toItem, const QString& fromSort,
                          const QString& toSort)
{
    const std::pair<const QString&, const char*> bounds[] = {
        {fromItem, " And ItemKey >= '"},
        {toItem, " And ItemKey <= '"},
        {fromSort, " And ItemSort >= '"},
        {toSort, " And ItemSort <= '"},
    };
    QString criteria;
    for (const auto& [text, fragment] : bounds) {
        const QString value = text.trimmed();
        if (!value.isEmpty())
            criteria += QLatin1String(fragment) + quoted(value) + QLatin1Char('\'');
    }
    return criteria;
}

bool RowIsSent(const LabelQuerySettings& s, int row)
{
    if (row < 0 || row >= LabelFieldCount || !s.sent[size_t(row)])
        return false;
    // "()" is no SQL: a ticked expression row left blank would fail the whole query.
    return row < FirstExpressionRow || !s.expressions[size_t(row)].trimmed().isEmpty();
}

QString BuildItemQuery(const LabelQuerySettings& s, int queryType, int orderBy)
{
    const bool account = s.useAccountKey && !s.accountKey.isEmpty();
    const QString key = quoted(s.accountKey);
    const bool docs = queryType == QueryByDocuments;
    const bool items = queryType == QueryByItems;
    auto sent = [&](int row) { return s.sent[size_t(row)]; };

    QString sql = QStringLiteral("SELECT tItems.ItemKey, tItems.ItemName, tItems.ItemSort, tItems.FName"
                                 ", tItems.BarCode, tItems.Local, tItems.Unit, tItems.Price"
                                 ", tItems.Coin, tItems.Coin AS CoinSign, tItems.VNItemName"
                                 ", 1 AS PackStart, tItems.Volume, tItems.Weight, tItems.SalPackUN");
    if (items) {
        sql += QStringLiteral(", tItems.Copies");
        sql += account ? QStringLiteral(", '") + key + QStringLiteral("' As AccountKey")
                       : QStringLiteral(", 'NoKey' As AccountKey");
    } else if (docs) {
        sql += QStringLiteral(", tTempDocHeaders.WizFileID, tTempDocHeaders.Number"
                              ", tTempDocLines.Copies, tTempDocHeaders.AccountKey");
    }

    // The account-dependent subqueries: by documents the header's account,
    // by items the typed account, or the item's own value without one.
    auto byAccount = [&](const QString& select, const QString& tail, const QString& fallback) {
        if (docs)
            return select + QStringLiteral(" AccountKey = tTempDocHeaders.AccountKey") + tail;
        if (account)
            return select + QStringLiteral(" AccountKey = '") + key + QLatin1Char('\'') + tail;
        return fallback;
    };
    for (int row : {8, 9, 10, 12, 11, 13, 14, 15, 17}) {
        if (!sent(row))
            continue;
        switch (row) {
        case 8:
            sql += docs ? QStringLiteral(", tTempDocLines.SerialNum") : QStringLiteral(", 'NoSerial' AS SerialNum");
            break;
        case 9:
            sql += docs ? QStringLiteral(", tTempDocHeaders.AccountKey As CardCode")
                        : account ? QStringLiteral(", '") + key + QStringLiteral("' As CardCode")
                                  : QStringLiteral(", 'NoCode' AS CardCode");
            break;
        case 10:
            sql += docs ? QStringLiteral(", tTempDocHeaders.Reference1") : QStringLiteral(", 'NoRef' AS Reference1");
            break;
        case 12:
            sql += byAccount(QStringLiteral(", (Select AlterNum From tAlterKeys Where"),
                             QStringLiteral(" And ItemKey = tItems.ItemKey) AS AlterKey"),
                             QStringLiteral(", tItems.ItemKey As AlterKey"));
            break;
        case 11:
            sql += byAccount(QStringLiteral(", (Select Price From tAlterPrices Where"),
                             QStringLiteral(" And ItemKey = tItems.ItemKey) AS SpecialPrice"),
                             QStringLiteral(", tItems.Price AS SpecialPrice"));
            break;
        case 13:
            sql += byAccount(QStringLiteral(", (Select AlterBar From tAlterKeys Where"),
                             QStringLiteral(" And ItemKey = tItems.ItemKey) AS AlterBar"),
                             QStringLiteral(", tItems.BarCode AS AlterBar"));
            break;
        case 14:
            if (docs)
                sql += QStringLiteral(", (Select Price From tAccountDef, tPriceList"
                                      " Where tAccountDef.AccountKey = tTempDocHeaders.AccountKey"
                                      " And tPriceList.ItemKey = tTempDocLines.ItemKey"
                                      " And tPriceList.PriceList = tAccountDef.PriceList) As ListPrice");
            else if (account)
                sql += QStringLiteral(", (Select Price From tAccountDef, tPriceList Where tAccountDef.AccountKey = '")
                    + key
                    + QStringLiteral("' And tPriceList.ItemKey = tItems.ItemKey"
                                     " And tPriceList.PriceList = tAccountDef.PriceList) As ListPrice");
            else
                sql += QStringLiteral(", tItems.Price AS ListPrice");
            break;
        case 15:
            sql += docs ? QStringLiteral(", tTempDocHeaders.CardName")
                        : account ? QStringLiteral(", '") + key + QStringLiteral("' As CardName")
                                  : QStringLiteral(", 'NoName' AS CardName");
            break;
        case 17:
            sql += docs ? QStringLiteral(", tTempDocHeaders.PackRem") : QStringLiteral(", 'NoRem' AS PackRem");
            break;
        default: break;
        }
    }
    for (int row = 18; row <= 20; ++row)
        if (sent(row))
            sql += docs ? QStringLiteral(", tTempDocLines.ExtraSum%1").arg(row - 17)
                        : QStringLiteral(", 'NoSum' AS ExtraSum%1").arg(row - 17);
    const std::pair<const char*, const char*> lineRows[] = {
        {", tItems.Copies AS Quantity", ", tTempDocLines.Quantity"},
        {", 'NoAlter' AS AlterNum", ", tTempDocLines.AlterNum"},
        {", 'NoName' AS AgentName",
         ", (Select AgentName From tAgents Where tAgents.AgentID = tTempDocLines.AgentID) AS AgentName"},
        {", 'NoName' AS ItemKeySon", ", tTempDocLines.ItemKeySon"},
        {", 'NoName' AS ItemNameSon", ", tTempDocLines.ItemNameSon"},
        {", 'NoName' AS LineItemName", ", tTempDocLines.ItemName AS LineItemName"},
        {", 'NoDetails' AS Details", ", tTempDocLines.Details"},
    };
    for (int row = 22; row <= 28; ++row)
        if (sent(row))
            sql += QLatin1String(docs ? lineRows[row - 22].second : lineRows[row - 22].first);
    if (sent(32))
        sql += QStringLiteral(", '") + StripQuoteChars(s.companyName) + QStringLiteral("' As CompName");
    for (int row = FirstExpressionRow; row < LabelFieldCount; ++row) {
        if (!RowIsSent(s, row))
            continue;
        sql += QStringLiteral(", (") + expressionSql(s.expressions[size_t(row)]) + QStringLiteral(") AS ")
            + QLatin1String(labelField(row).column);
    }

    sql += QStringLiteral(" FROM tItems");
    if (docs)
        sql += QStringLiteral(" , tTempDocHeaders, tTempDocLines");
    sql += QStringLiteral(" WHERE (1 > 0)");
    if (items) {
        sql += QStringLiteral(" And tItems.PrintLabel = True") + s.itemRangeCriteria;
    } else if (docs) {
        sql += QStringLiteral(" And tTempDocLines.WizFileID = tTempDocHeaders.WizFileID"
                              " And tTempDocLines.HeadNumber = tTempDocHeaders.Number"
                              " And tItems.Itemkey = tTempDocLines.Itemkey"
                              " And (tTempDocHeaders.Include = True) And (tTempDocLines.Include = True)");
    }
    const QString d = orderBy == OrderAscending ? QStringLiteral("ASC")
                    : orderBy == OrderDescending ? QStringLiteral("DESC") : QString();
    if (items)
        sql += QStringLiteral(" ORDER BY tItems.Itemkey ") + d;
    else if (docs)
        sql += QStringLiteral(" ORDER BY tTempDocLines.WizFileID ") + d + QStringLiteral(", tTempDocLines.HeadNumber ")
            + d + QStringLiteral(", tTempDocLines.LineNum ") + d;
    return sql;
}

} // namespace tagora
