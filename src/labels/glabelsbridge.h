#pragma once

#include "labels/labelbridge.h"

#include <QHash>
#include <QSet>
#include <QString>
#include <QStringList>
#include <vector>

namespace tagora {

// What a gLabels 3 document (.glabels, XML, plain or gzip-compressed) holds
// that a merge depends on.
struct GlabelsDocument {
    QString path;           // as opened, absolute
    QByteArray xml;         // the document's XML, uncompressed
    QSet<QString> fields;   // merge fields its objects use, by exact name
    QSet<QString> embedded; // pictures it carries inside, by the name objects use
    int labelsPerSheet = 1; // labels one page of its template holds
};

// Reads a gLabels document. False with a Hebrew description when the file
// is missing, unreadable or not a gLabels document.
bool ReadGlabelsDocument(const QString& path, GlabelsDocument* document, QString* error);

// The document as gLabels should merge it: its own merge source replaced by
// the CSV file at csvPath (keys on the first line), pictures named relative
// to the document's folder named by full path, everything else as it was.
bool GlabelsMergeCopy(const GlabelsDocument& document, const QString& csvPath, QByteArray* xml, QString* error);

// Prints labels through gLabels' batch program. A label file is a gLabels
// document whose merge fields are named like the label variables. Records
// are collected as merge rows, one per copy, and the file's labels are made
// in one run of glabels-3-batch when the label is closed, into a PDF that
// goes to the chosen CUPS printer or, without one, stays in the job folder
// as tgrlab-NNN.pdf. A variable the document has no field for fails where
// it is set, so the run's failure names it; a field no variable is sent to
// prints empty. Records not yet closed when the sink goes are not printed.
class GlabelsSink : public LabelSink {
public:
    explicit GlabelsSink(BridgeOptions options);
    ~GlabelsSink() override;

    bool openLabel(const QString& file, QString* error) override;
    bool setVariable(const QString& name, const QString& value, QString* error) override;
    bool printRecord(int copies, QString* error) override;
    bool closeLabel(QString* error) override;

    // The PDFs this sink left in the job folder (no printer chosen), in order.
    QStringList keptFiles() const { return m_kept; }

private:
    bool canMakeLabels(QString* program, QString* error) const;
    bool makeLabels(QString* error);
    bool runBatch(const QString& program, const QString& document, const QString& csv, const QString& pdf,
                  int expectedPages, QString* error);
    QString nextStem();

    BridgeOptions m_options;
    bool m_open = false;
    GlabelsDocument m_document;
    QStringList m_names;             // variables in the order first set
    QHash<QString, int> m_column;    // variable -> index in m_names
    QStringList m_values;            // current values, by m_names
    std::vector<QStringList> m_rows; // one per label, as the values stood
    int m_counter = 0;
    QStringList m_kept;
};

// The project's sample label for the demo company (50 x 30 mm: item name,
// key, price and the EAN-13 barcode from the fields ItemName, ItemKey,
// Price, BarCode), written into folder as demo-item.glabels unless a file
// of that name is there already (it may have been edited since). Its path,
// or empty text with a description in *error.
QString DemoGlabelsLabel(const QString& folder, QString* error);
// The same for any of the project's sample labels by file name
// ("demo-item.glabels", "demo-item.zpl").
QString DemoLabel(const QString& folder, const QString& fileName, QString* error);

} // namespace tagora
