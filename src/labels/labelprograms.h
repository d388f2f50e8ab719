#pragma once

#include "labels/programautomation.h"
#include "platform/filedialog.h"

#include <QString>
#include <memory>

namespace tagora {

// Where a label run stands, for the failure message: the step it was at, the
// label identifier a program handed back (NiceLabel), and the last variable sent.
struct RunTrace {
    int step = 0;
    qlonglong labelId = 0;
    QString lastVar;
    QString lastValue;
};

// One label program behind the phases every run goes through. Each adapter
// makes exactly its program's calls, in its order; step numbers are set
// before the calls that have one. Every phase returns false with the
// program's description on a failed call.
class LabelProgram {
public:
    virtual ~LabelProgram() = default;

    // The program for a label program code (5 NiceLabel, 2 CodeSoft,
    // 4 BarTender, 7 FastLabel); null for any other code.
    static std::unique_ptr<LabelProgram> forCode(int code, bool sheets);
    static QString progId(int code);

    // Creates the application object (step 2).
    bool start(const AutomationRegistry& registry, RunTrace& trace, QString* error);

    // header: the label opened or closed is a document's header label.
    virtual bool switchIn(const QString& file, bool header, RunTrace& trace, QString* error) = 0;
    virtual bool switchOut(bool beforeHeader, RunTrace& trace, QString* error) = 0;
    virtual bool beforeRecord(RunTrace&, QString*) { return true; }
    virtual bool setVariable(const QString& name, const QString& text, RunTrace& trace, QString* error) = 0;
    virtual bool printRecord(int copies, RunTrace& trace, QString* error) = 0;
    virtual bool printHeader(RunTrace& trace, QString* error) = 0;
    virtual bool end(RunTrace& trace, QString* error) = 0;

protected:
    explicit LabelProgram(QString progId)
        : m_progId(std::move(progId))
    {
    }
    bool call(AutomationObject& target, const QString& member, const QVariantList& args, QString* error,
              QVariant* result = nullptr)
    {
        return target.call(member, args, result, error);
    }

    QString m_progId;
    std::shared_ptr<AutomationObject> m_app;
};

// The label-file filter for a label program code; empty for an unknown code.
QString labelFileFilter(int programCode);

// Asks for a label file of the given program; empty text when cancelled.
QString ChooseLabelFile(int programCode, CommonDialog* dialog, bool promptCreate);

} // namespace tagora
