#include "labels/labelpreview.h"

#include "labels/barcode.h"
#include "labels/directlabels.h"
#include "localdb/database.h"

#include <QDir>
#include <QFile>

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

} // namespace tagora
