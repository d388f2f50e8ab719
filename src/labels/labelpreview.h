#pragma once

#include "labels/directlayout.h"

#include <QString>
#include <QVariant>
#include <QVector>

namespace tagora {

class BarcodeLibrary;

// One label field as the preview record carries it: the record column the
// job would read, whether it is a price, and the value.
struct PreviewField {
    QString name;
    bool isPrice = false;
    QVariant value;
};

// Writes, in folder, the page of one label for one record (fields by field
// index), as the direct job writes it: its pictures and its page, only one
// label on a sheet of one and never the print dialog. *page receives the page's
// path. Empty text on success.
QString WritePreviewPage(const QString& folder, const DirectLabelLayout& layout, const QVector<PreviewField>& fields,
                         const QString& priceFormat, BarcodeLibrary& library, QString* page);

// The browser draws the one label centred on a window larger than any label;
// this cuts the picture at path down to what was drawn, with a small margin,
// so the designer shows the label whole and nothing else. False when the
// picture cannot be read or written.
bool TrimPreviewPicture(const QString& path);

} // namespace tagora
