#pragma once

#include "labels/programautomation.h"

#include <QString>
#include <functional>
#include <memory>

namespace tagora {

// What a bridge to a real label output does with the labels an adapter
// sends, whichever program's calls carried them. The calls come in the
// adapter's order: a label file is opened, each record's variables are set
// and the record is printed with its copies, and the file is closed when the
// adapter switches to another file (a header label, another account's label)
// or ends the run. A sink may collect records and print them when the file
// is closed; what it could not print is an error there, never a silent loss.
class LabelSink {
public:
    virtual ~LabelSink() = default;
    virtual bool openLabel(const QString& file, QString* error) = 0;
    // A variable keeps its value for the following records until set again.
    virtual bool setVariable(const QString& name, const QString& value, QString* error) = 0;
    // The record as its variables stand, copies times.
    virtual bool printRecord(int copies, QString* error) = 0;
    // The open file is done: whatever was collected for it goes out now.
    virtual bool closeLabel(QString* error) = 0;
};

// Where a bridge sends what it made, from the settings and the general tab.
struct BridgeOptions {
    QString printer;    // the CUPS queue chosen on the general tab; empty: none
    QString jobFolder;  // the job folder (made ready by the caller): files are kept here
    QString zplHost;    // "host:port" for raw ZPL over a socket; empty: the CUPS queue
    int timeoutSeconds = 60; // each outside step (a program, the printer, the socket)
};

// One sink per program object the adapter creates (one per run).
using LabelSinkFactory = std::function<std::unique_ptr<LabelSink>(const QString& progId)>;

// Serves the four label programs' ProgIDs by answering their automation
// calls as the program would, turning them into a sink's events:
//   NiceLabel  LabelOpen, LabelSetVar, LabelPrint / LabelSessionPrint,
//              LabelSessionStart/End, LabelClose, Quit
//   CodeSoft   Visible, ActiveDocument, Open, Variables(name).Value,
//              PrintLabel, FormFeed, Close
//   BarTender  Visible, Formats, Open, SetNamedSubStringValue,
//              IdenticalCopiesOfLabel, PrintOut, Close, Quit
//   FastLabel  LabelOpen, LabelSetVar, LabelQty, AddRecord, LabelPrint
// FastLabel collects records and prints them at LabelPrint, as the program
// does. An unknown member fails with the member's name.
class BridgeProvider : public AutomationProvider {
public:
    explicit BridgeProvider(LabelSinkFactory factory);
    std::shared_ptr<AutomationObject> create(const QString& progId, QString* error) override;

private:
    LabelSinkFactory m_factory;
};

} // namespace tagora
