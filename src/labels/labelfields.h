#pragma once

#include <QString>

namespace tagora {

// One row of the label field table: what a label may receive and where the
// label-data record keeps it. Rows 0..32 sit on the "data for the label" tab,
// 33..37 (the user expressions) on the "further data" tab.
struct LabelField {
    int row;
    const char* name;        // variable name on the label (caption of LblFldName)
    const char* column;      // record column holding the value (tag of LblFldDesc)
    char kind;               // '1' text, '2' price, '5' user expression (tag of LblFldName)
    const char* description; // Hebrew description (caption of LblFldDesc)
};

constexpr int LabelFieldCount = 38;
constexpr int FirstExpressionRow = 33;

// The rows in order; labelFields()[i].row == i.
const LabelField* labelFields();
const LabelField& labelField(int row);

inline bool isExpressionKind(char kind) { return kind == '5'; }

} // namespace tagora
