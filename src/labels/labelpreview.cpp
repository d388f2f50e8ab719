#include "labels/labelpreview.h"

#include "labels/barcode.h"
#include "labels/directlabels.h"
#include "localdb/database.h"

#include <algorithm>

#include <QDir>
#include <QFile>
#include <QImage>

namespace tagora {

QString WritePreviewPage(const QString& folder, const DirectLabelLayout& layout, const QVector<PreviewField>& fields,
                         const QString& priceFormat, BarcodeLibrary& library, QString* page)
{
    if (const QString why = PrepareJobFolder(folder); !why.isEmpty())
        return why;
    DirectLabelLayout one = layout;
    one.page.PageRows = 1;
    one.page.PageCols = 1;
    one.page.PageAutoPrint = false;

    // The record goes through a database as the job's records do, so the page
    // reads it with the same types and conversions.
    QStringList columns{QStringLiteral("Copies")};
    QVariantList values{1};
    for (int i = 0; i < kDirectLines; ++i) {
        LabelLineDef& line = one.lines[size_t(i)];
        if (!line.UseCell)
            continue;
        if (line.FldID < 0 || line.FldID >= fields.size() || fields[line.FldID].name.isEmpty())
            return QStringLiteral("שורה %1 של המדבקה הישירה אינה מוגדרת לשדה").arg(i + 1);
        const PreviewField& f = fields[line.FldID];
        line.FieldName = f.name;
        line.IsPrice = f.isPrice;
        if (!columns.contains(f.name, Qt::CaseInsensitive)) {
            columns << f.name;
            values << f.value;
        }
    }
    const QString dbPath = QDir(folder).filePath(QStringLiteral("preview.db"));
    QFile::remove(dbPath);
    {
        Database db;
        DbError e = db.open(dbPath, Database::OpenMode::Create);
        QStringList quoted, marks;
        for (const QString& c : columns) {
            quoted << QLatin1Char('"') + QString(c).replace(QLatin1Char('"'), QStringLiteral("\"\"")) + QLatin1Char('"');
            marks << QStringLiteral("?");
        }
        if (!e)
            e = db.exec(QStringLiteral("CREATE TABLE tPreview (%1)").arg(quoted.join(QLatin1Char(','))));
        Statement insert;
        if (!e)
            insert = db.prepare(QStringLiteral("INSERT INTO tPreview (%1) VALUES (%2)")
                                    .arg(quoted.join(QLatin1Char(',')), marks.join(QLatin1Char(','))),
                                &e);
        for (int k = 0; !e && k < values.size(); ++k)
            insert.bind(k + 1, values[k]);
        if (!e)
            e = insert.run();
        if (e)
            return e.message;
    }
    const QString sql = QStringLiteral("SELECT * FROM tPreview");
    LabelBarDef bar = one.bar;
    if (bar.BarType >= 0) {
        for (const LabelLineDef& line : one.lines) {
            if (line.ViewType != 1 || !line.UseCell)
                continue;
            // A value the symbology refuses simply shows no picture, as on paper.
            if (const QString why = MakeBarcodeImages(folder, line.FieldName, line.FldID, dbPath, sql, bar, library,
                                                      nullptr);
                !why.isEmpty())
                return why;
        }
    }
    const QString file = QDir(folder).filePath(QStringLiteral("tgrlab1.htm"));
    if (const QString why = CreateLabPage(file, dbPath, sql, one, priceFormat, nullptr); !why.isEmpty())
        return why;
    if (page)
        *page = file;
    return QString();
}

bool TrimPreviewPicture(const QString& path)
{
    QImage image(path);
    if (image.isNull())
        return false;
    image = image.convertToFormat(QImage::Format_RGB32);
    // Anti-aliased edges are near white; only what a reader would see counts.
    auto inked = [](QRgb p) { return qRed(p) < 240 || qGreen(p) < 240 || qBlue(p) < 240; };
    int left = image.width(), right = -1, top = image.height(), bottom = -1;
    for (int y = 0; y < image.height(); ++y) {
        const auto* line = reinterpret_cast<const QRgb*>(image.constScanLine(y));
        for (int x = 0; x < image.width(); ++x) {
            if (!inked(line[x]))
                continue;
            left = std::min(left, x);
            right = std::max(right, x);
            top = std::min(top, y);
            bottom = std::max(bottom, y);
        }
    }
    // A label with nothing in use is a blank picture; it stays as drawn.
    if (right < 0)
        return true;
    // The quiet zone a barcode needs to be read lies in the margin.
    const int margin = 16;
    const QRect box = QRect(QPoint(left, top), QPoint(right, bottom))
                          .adjusted(-margin, -margin, margin, margin)
                          .intersected(image.rect());
    const QString aside = path + QStringLiteral(".part");
    if (!image.copy(box).save(aside, "PNG"))
        return false;
    QFile::remove(path);
    return QFile::rename(aside, path);
}

} // namespace tagora
