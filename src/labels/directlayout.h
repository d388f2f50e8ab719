#pragma once

#include "labels/barcode.h"

#include <QString>
#include <array>

namespace tagora {

class SettingsStore;

// One line of the direct label.
struct LabelLineDef {
    bool UseCell = false;
    short FldID = -1;      // index into the label field table; -1 none
    QString FieldName;     // filled for each job: the record column of FldID
    uchar ViewType = 0;    // 0 text, 1 barcode picture
    uchar Font = 0;        // 0 Arial (Hebrew), 1 David, 2 Miriam
    uchar FontSize = 9;
    uchar FontWeight = 0;  // 0 Normal, 1 Bolder, 2 Bold
    bool FontUL = false;
    bool FontItalic = false;
    uchar Align = 1;       // 0 Right, 1 Center, 2 Left
    uchar Direction = 1;   // 0 ltr, 1 rtl
    QString Prefix;
    bool IsPrice = false;  // filled for each job
    short Height = 0;      // points; 0 or less not set
    bool Border = false;
};

// The printed page of direct labels.
struct LabelPageDef {
    short PageRows = 6;
    short PageCols = 4;
    bool PageAutoPrint = false;
    short MaxTextLen = 0;
    short LabTop = 0;
    short LabBottom = 0;
};

constexpr int kDirectLines = 7;

struct DirectLabelLayout {
    std::array<LabelLineDef, kDirectLines> lines{};
    LabelBarDef bar;
    LabelPageDef page;
};

// Why the layout cannot make a sheet of labels, naming the setting, or empty
// text when it can. Each number must lie within what a printed sheet holds:
// PageRows and PageCols 1-100, LabTop and LabBottom -1000 to 1000; on a line
// in use FontSize 1-200 points and Height up to 2000 points; with a barcode
// line in use DimX up to 0.5 and BarHeight up to 10 inches, UserResoX and
// UserResoY up to 2000 pixels. The settings that mean "not set" (0 or less)
// stay allowed. Checked before a job touches anything, so a sheet of 32,767
// by 32,767 labels is refused at once instead of written for minutes.
QString CheckDirectLayout(const DirectLabelLayout& layout);

// The layout of this process, shared by every control on its thread.
DirectLabelLayout& directLabelLayout();

// Saves (1) or loads (2) the layout in the settings store: sections
// LabelDef0..LabelDef6, LabelBar (only while BarType is 0 or more) and
// DirectLabel. Booleans are stored as -1 and 0; a stored True/False reads as
// -1/0; a missing key gives its default; a value that does not read is skipped.
void SetGetLabelDefs(int action, DirectLabelLayout& layout, SettingsStore& store);

} // namespace tagora
