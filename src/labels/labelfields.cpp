#include "labels/labelfields.h"

namespace tagora {

namespace {
// Names and columns differ for a few rows on purpose: the label variable
// keeps the name label designers know, the column is what the query yields.
const LabelField kFields[LabelFieldCount] = {
    {0, "ItemKey", "ItemKey", '1', "קוד פריט"},
    {1, "ItemName", "ItemName", '1', "שם פריט"},
    {2, "ItemSort", "ItemSort", '1', "קוד השתייכות"},
    {3, "FName", "FName", '1', "שם לועזי"},
    {4, "BarCode", "BarCode", '1', "בר-קוד"},
    {5, "Unit", "Unit", '1', "יחידת מידה"},
    {6, "Price", "Price", '2', "מחיר"},
    {7, "CoinSign", "CoinSign", '1', "מטבע"},
    {8, "SerialNum", "SerialNum", '1', "מספר סידורי"},
    {9, "CardCode", "CardCode", '1', "קוד כרטיס"},
    {10, "Reference1", "Reference1", '1', "אסמכתא"},
    {11, "AltItemPrice", "SpecialPrice", '2', "מחיר מיוחד"},
    {12, "AltItemKey", "AlterKey", '1', "מפתח חליפי"},
    {13, "AltItemBar", "AlterBar", '1', "בר-קוד חליפי"},
    {14, "CardPrice", "ListPrice", '2', "מחיר מחירון לקוח"},
    {15, "CardName", "CardName", '1', "שם לקוח"},
    {16, "VNItemName", "VNItemName", '1', "שם פריט VN"},
    {17, "PackRem", "PackRem", '1', "הערות ליצוא"},
    {18, "ExtraSum1", "ExtraSum1", '1', "גורם מכפלה 1"},
    {19, "ExtraSum2", "ExtraSum2", '1', "גורם מכפלה 2"},
    {20, "ExtraSum3", "ExtraSum3", '1', "גורם מכפלה 3"},
    {21, "PackStart", "PackStart", '1', "איתחול אריזות"},
    {22, "Quantity", "Quantity", '1', "כמות (אריזות)"},
    {23, "AlterNum", "AlterNum", '1', "חליפי משורת מסמך"},
    {24, "AgentName", "AgentName", '1', "שם סוכן משורת מסמך"},
    {25, "ItemKeySon", "ItemKeySon", '1', "קוד פריט בן"},
    {26, "ItemNameSon", "ItemNameSon", '1', "שם פריט בן"},
    {27, "LineItemName", "LineItemName", '1', "שם פריט בשורה"},
    {28, "Details", "Details", '1', "פרטים בשורה"},
    {29, "Weight", "Weight", '1', "משקל"},
    {30, "Volume", "Volume", '1', "נפח"},
    {31, "PackUnits", "SalPackUN", '1', "יחידות באריזה"},
    {32, "CompName", "CompName", '1', "שם חברה"},
    {33, "EX1", "EX1", '5', "ביטוי 1"},
    {34, "EX2", "EX2", '5', "ביטוי 2"},
    {35, "EX3", "EX3", '5', "ביטוי 3"},
    {36, "EX4", "EX4", '5', "ביטוי 4"},
    {37, "EX5", "EX5", '5', "ביטוי 5"},
};
} // namespace

const LabelField* labelFields() { return kFields; }

const LabelField& labelField(int row) { return kFields[row]; }

} // namespace tagora
