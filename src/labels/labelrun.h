#pragma once

#include <QString>
#include <functional>
#include <vector>

namespace tagora {

class AutomationRegistry;
class ProgressSink;

// A row of the label field table that is sent: the variable name on the
// label, the record column that fills it, and whether it is a price.
struct SentField {
    QString name;
    QString column;
    bool price = false;
};

// Everything one run of a label program needs, read from the screen when the
// run starts.
struct LabelRunRequest {
    QString defaultLabel;
    int programCode = 0;
    QString dbPath;
    QString sql;          // the label-data query, in the printer type's order
    bool printHeader = false;
    bool byPlate = false;
    QString delayText;    // whole seconds to wait after each record; empty is 0
    bool sheets = false;  // sheets of labels rather than a roll
    QString headerLabel;
    QString priceFormat;  // trimmed; empty means "0.00"
    std::vector<SentField> fields;
};

struct LabelRunResult {
    enum class Status { Done, NoRecords, Failed };
    Status status = Status::Failed;
    // For a failure: the error's description with the step, the label id and
    // the last variable and value sent.
    QString message;
};

// Prints the records of the query through the program's adapter: the label
// file per record (default, per-account, second label for long values, the
// list's own path), header labels per document, the delay between records.
// The database and every automation object are released whatever happens.
// pumpEvents is called between a record's variables and its print: for the
// first record, then whenever 25 ms or more have passed since the last call.
LabelRunResult RunLabelProgram(const LabelRunRequest& request, const AutomationRegistry& registry,
                               ProgressSink* progress, const std::function<void()>& pumpEvents);

// Waits until `seconds` whole-second boundaries of the clock have passed,
// sleeping rather than spinning and letting no events run.
void WaitSeconds(int seconds);

} // namespace tagora
