#include "control/settingstable.h"

#include "labels/labelfields.h"
#include "platform/platformdefaults.h"

#include <QObject>

namespace tagora {

namespace {
constexpr int Text = int(BindKind::Text);
constexpr int ListIndex = int(BindKind::ListIndex);
constexpr int Value = int(BindKind::Value);
constexpr int Caption = int(BindKind::Caption);

std::vector<SettingRow> generalParams()
{
    return {
        {"CompanyName", "txtCompanyName", Text, "ונמר מערכות מידע"},
        {"OptOLE0", "OptOLE(0)", Value, "-1"},
        {"OptOLE1", "OptOLE(1)", Value, "0"},
        {"OptOLE2", "OptOLE(2)", Value, "0"},
        {"OptOLE3", "OptOLE(3)", Value, "0"},
        {"OptOLE4", "OptOLE(4)", Value, "0"},
        {"LabelName", "txtLabelName", Text, platformDefault("c:\\mylabel.lbl")},
        {"LabelName2", "txtLabelName2", Text, platformDefault("c:\\mylabel.lbl")},
        {"DBPath", "txtDBPath", Text, platformDefault("c:\\program files\\tagora")},
        {"LabelNameHead", "txtLabelNameHead", Text, platformDefault("c:\\mylabel.lbl")},
        {"OptPrinter0", "OptPrinter(0)", Value, "0"},
        {"OptPrinter1", "OptPrinter(1)", Value, "-1"},
        {"User", "cmbUser", ListIndex, "0"},
        {"ItmRTL", "chkItmRTL", Value, "1"},
        {"PrintDelay", "txtPrintDelay", Text, "0"},
        {"DefPrinter", "cmbPrinter", Text, "-1"},
    };
}

std::vector<SettingRow> importItems()
{
    return {
        {"ItemNameType", "CmbItemNameType", ListIndex, "0"},
        {"PriceField", "cmbPriceField", ListIndex, "0"},
        {"Copies", "txtCopies", Text, "1"},
        {"ImportAlterKeys", "ChkImportAlterKeys", Value, "0"},
        {"ImportAltKeySup", "ChkImportAltKeySup", Value, "0"},
        {"CleanAlterKeys", "ChkCleanAlterKeys", Value, "0"},
        {"ImportAlterPrices", "ChkImportAlterPrices", Value, "0"},
        {"CleanItems", "ChkClean", Value, "0"},
        {"FromItemSort", "txtFromItemSort", Text, ""},
        {"ToItemSort", "txtToItemSort", Text, ""},
        {"ReadPriceList", "chkReadPriceList", Value, "0"},
        {"ReadItemParam", "chkReadItemParam", Value, "0"},
    };
}

std::vector<SettingRow> labelVars()
{
    std::vector<SettingRow> rows;
    for (int i = 0; i < LabelFieldCount; ++i) {
        const QString prefix = QStringLiteral("%1").arg(i, 2, 10, QLatin1Char('0'));
        const QString index = QStringLiteral("(%1)").arg(i);
        rows.push_back({prefix + "FldSend", "ChkFldSend" + index, Value, "0"});
        rows.push_back({prefix + "VarNum", "lblVarNum" + index, Caption, ""});
        if (isExpressionKind(labelField(i).kind))
            rows.push_back({prefix + "FldExpr", "txtFldExpr" + index, Text, ""});
    }
    rows.push_back({"PriceFormat", "txtPriceFormat", Text, "0.00"});
    return rows;
}

std::vector<SettingRow> labelByItems()
{
    return {
        {"FromItem", "txtFromItem", Text, ""},
        {"ToItem", "txtToItem", Text, ""},
        {"UseAccountKey", "ChkUseAccountKey", Value, "0"},
        {"AccountKey", "txtAccountKey", Text, ""},
        {"FromSort", "txtFromSort", Text, ""},
        {"ToSort", "txtToSort", Text, ""},
    };
}

std::vector<SettingRow> labelByDocs()
{
    return {
        {"FromDate", "txtFromDate", Text, "01/01/1980"},
        {"ToDate", "txtToDate", Text, "01/01/2025"},
        {"FromDocNum", "txtFromDocNum", Text, ""},
        {"ToDocNum", "txtToDocNum", Text, ""},
        {"ReadDocItems", "chkReadDocItems", Value, "0"},
        {"PrintHeadLabel", "chkPrintHeadLabel", Value, "0"},
        {"WithSons", "chkWithSons", Value, "0"},
        {"OnlyLine0", "chkOnlyLine0", Value, "0"},
        {"RefPref", "txtRefPref", Text, ""},
    };
}

std::vector<SettingRow> importDocs()
{
    return {
        {"QtyFrom", "cmbQtyFrom", ListIndex, "0"},
        {"QtyFactor", "txtQtyFactor", Text, "1"},
    };
}

std::vector<SettingRow> labelByPlate()
{
    return {
        {"AccKeyForPlate", "txtAccKeyForPlate", Text, ""},
        {"UseAccKeyForPlate", "ChkUseAccKeyForPlate", Value, "0"},
    };
}
} // namespace

const std::vector<SettingSection>& settingSections()
{
    static const std::vector<SettingSection> sections = {
        {1, "GeneralParams", "cmdSaveDef1"},
        {2, "ImportItems", "cmdSaveDef2"},
        {3, "LabelVars", "CmdSaveFields"},
        {4, "LabelByItems", "cmdSaveDef4"},
        {5, "LabelByDocs", "cmdSaveDef5"},
        {6, "ImportDocs", "SaveDef6"},
        {7, "LabelByPlate", "cmdSaveDef3"},
    };
    return sections;
}

const SettingSection* settingSection(int number)
{
    for (const SettingSection& s : settingSections())
        if (s.number == number)
            return &s;
    return nullptr;
}

std::vector<SettingRow> settingRows(int section)
{
    switch (section) {
    case 1: return generalParams();
    case 2: return importItems();
    case 3: return labelVars();
    case 4: return labelByItems();
    case 5: return labelByDocs();
    case 6: return importDocs();
    case 7: return labelByPlate();
    default: return {};
    }
}

std::optional<int> boundKind(const QString& controlName)
{
    for (const SettingSection& section : settingSections())
        for (const SettingRow& row : settingRows(section.number))
            if (row.control == controlName)
                return row.kind;
    return std::nullopt;
}

std::optional<BindKind> addressKind(const QObject* control)
{
    if (!control)
        return std::nullopt;
    if (const auto k = boundKind(control->objectName()))
        return BindKind(*k);
    return naturalKind(control);
}

const std::vector<int>& showLoadOrder()
{
    static const std::vector<int> order = {1, 3, 2, 4, 5, 7, 6};
    return order;
}

} // namespace tagora
