#pragma once

#include "labels/labelbridge.h"

#include <QByteArray>
#include <QHash>
#include <QSet>
#include <QString>
#include <vector>

namespace tagora {

// A thermal printer's own language as the label output. A label file is a
// ZPL template, UTF-8 text, with the label variables written as ${Name}
// (for example ^FD${ItemName}^FS). Each printed record is the template with
// the record's values put in, its copies set with ^PQ in the last format;
// the records of one label file go out together when it is closed:
//   - to options.zplHost ("host:port", port 9100 when left out) over TCP,
//   - else to the CUPS queue options.printer as a raw job,
//   - else the job is only kept in the job folder.
// For CUPS the job is written to the job folder first (tgrlab-NNN.zpl, the
// first free number) and stays there; over TCP nothing is written.
//
// What a value may hold never becomes a command: inside field data (after
// ^FD or ^FV) the value is written with the field's hex indicator for the
// command prefixes ^ and ~ and for the indicator itself; a field that has a
// variable and no ^FH gets ^FH\ in front of its ^FD (and its own backslashes
// written as \5C, so the template's text prints as written). A variable
// placed outside field data (a command's parameter) takes its value as it
// is, and a value holding ^, ~ or a control character there fails the record.
//
// ZPL draws each field left to right, so values in text fields go out in
// visual order (VisualOrder). Barcode fields keep the logical order: their
// data is what the scanner must read back. Each format gets ^CI28 (UTF-8)
// right after ^XA unless it declares it; a format that declares another
// character set is refused, since the values are written as UTF-8.
class ZplSink : public LabelSink {
public:
    explicit ZplSink(BridgeOptions options);
    ~ZplSink() override;

    bool openLabel(const QString& file, QString* error) override;
    bool setVariable(const QString& name, const QString& value, QString* error) override;
    bool printRecord(int copies, QString* error) override;
    bool closeLabel(QString* error) override;

    // A part of a parsed template: text as it goes out, a variable, or the
    // quantity of the last format's ^PQ.
    struct Part {
        enum class Kind { Text, Variable, Copies };
        Kind kind = Kind::Text;
        QString text;      // Text: the text; Variable: the name
        bool field = false;   // a variable inside field data
        bool visual = false;  // a variable in a text field: reordered for drawing
        QChar indicator;      // a variable inside field data: the field's hex indicator
    };

private:
    bool send(const QByteArray& job, const QString& title, QString* error);

    BridgeOptions m_options;
    QString m_file;               // the open label file; empty when none is open
    std::vector<Part> m_parts;    // its template, parsed
    QSet<QString> m_names;        // the variables its template holds
    QHash<QString, QString> m_values;
    QByteArray m_job;             // the records collected since the file was opened
};

// The text as a left-to-right device must draw it: reordered by the Unicode
// bidirectional algorithm (FriBidi), each line on its own, with mirrored
// brackets on right-to-left runs and the directional marks dropped. A line
// that holds Hebrew is a right-to-left paragraph; any other line takes its
// direction from its first strong character, so Latin-only text is unchanged.
QString VisualOrder(const QString& logical);

// Splits "host:port" (an IPv6 address in brackets); the port is 9100 when
// left out. False for an empty host or a port that is not 1 to 65535.
bool ParseZplHost(const QString& text, QString* host, quint16* port);

} // namespace tagora
