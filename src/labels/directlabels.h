#pragma once

#include "labels/directlayout.h"

#include <QString>
#include <QStringList>
#include <QVariant>
#include <QVector>

namespace tagora {

class ProgressSink;
class BarcodeLibrary;

// The folder the pages we show are written in: "Temp" when that variable is
// set; otherwise a folder of the user's own ($XDG_RUNTIME_DIR, else the
// user's cache folder; the temporary folder on Windows, which is the user's
// own there).
QString UserTempFolder();
// The folder of a direct-label job: "tgrlab" in UserTempFolder().
QString directJobFolder();
// Makes the job folder (mode 0700) or takes it as it stands: a link, a folder
// of another user or one others may write to is refused with the reason.
// Then removes what earlier jobs left there (the label page, its PDF, the item list
// and the barcode pictures), and nothing else. Empty text on success.
QString PrepareJobFolder(const QString& folder);

// A record whose barcode the symbology cannot encode: it gets no picture.
struct BarcodeRefusal {
    int record = 0;
    int labels = 0;     // the record's labels on the page (its copies)
    QString data;
    QString reason;     // the barcode type, the value and why, in Hebrew
};

// The attention message after a job whose page has labels without their
// barcode: how many of the page's labels lack one, and why, record by
// record. Empty when no label on the page lacks one.
QString BarcodeRefusalMessage(const QVector<BarcodeRefusal>& refused, long long labelsOnPage);

// The pictures of one barcode line, one per record with a text value, named
// by field index and record number. Empty text on success; refusals of the
// symbology are collected, not fatal; a picture that cannot be written whole
// ends the line with the reason.
QString MakeBarcodeImages(const QString& folder, const QString& column, int fieldIndex, const QString& dbPath,
                          const QString& sql, LabelBarDef& bar, BarcodeLibrary& library,
                          QVector<BarcodeRefusal>* refusals);

// The style rules of the page, one line each.
QStringList WriteLabelStyles(const DirectLabelLayout& layout);

// A text as a one-row table with a cell per character, so that its order
// holds whatever the browser's direction rules; characters are escaped,
// blanks are &nbsp; (a run of blanks one cell), cell separators dropped.
// The first character is the rightmost: right for the cell form of a
// connection of type 1, whose text is in display order. The page writes the
// name of a type 2 connection, in logical order, as text instead.
QString LetterTable(const QVariant& value, const QString& className);

// Writes the page of labels for the records of sql on dbPath: Windows-1255
// (characters it lacks as numeric references), CRLF, a grid of labels per
// printed page. The layout's lines must carry their FieldName and IsPrice.
// Empty text on success. The page is written aside and renamed into place, so
// a failure leaves no cut page behind (and an earlier page at the name stays).
// labels, when given, receives the number of labels on the page.
QString CreateLabPage(const QString& fileName, const QString& dbPath, const QString& sql,
                      const DirectLabelLayout& layout, const QString& priceFormat, ProgressSink* progress,
                      long long* labels = nullptr);

// The cell size attribute value for n rows or columns: 100 / n with one decimal, at least two digits.
QString cellPercent(int count);

} // namespace tagora
