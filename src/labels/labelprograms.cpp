#include "labels/labelprograms.h"

namespace tagora {

namespace {

class CodeSoft : public LabelProgram {
public:
    CodeSoft()
        : LabelProgram(QStringLiteral("LPPX.Application"))
    {
    }

    bool switchIn(const QString& file, bool, RunTrace&, QString* error) override
    {
        if (!m_app->setProperty(QStringLiteral("Visible"), false, error))
            return false;
        m_document = m_app->object(QStringLiteral("ActiveDocument"), {}, error);
        return m_document && call(*m_document, QStringLiteral("Open"), {file}, error);
    }

    bool setVariable(const QString& name, const QString& text, RunTrace&, QString* error) override
    {
        auto variable = m_document->object(QStringLiteral("Variables"), {name}, error);
        return variable && variable->setProperty(QStringLiteral("Value"), text, error);
    }

    bool printRecord(int copies, RunTrace&, QString* error) override
    {
        return call(*m_document, QStringLiteral("PrintLabel"), {copies}, error);
    }

    bool printHeader(RunTrace&, QString* error) override
    {
        return call(*m_document, QStringLiteral("PrintLabel"), {1}, error);
    }

    bool switchOut(bool, RunTrace&, QString* error) override
    {
        return call(*m_document, QStringLiteral("FormFeed"), {}, error)
            && call(*m_document, QStringLiteral("Close"), {0}, error);
    }

    // The program stays open with its last document; only the feed is sent.
    bool end(RunTrace&, QString* error) override { return call(*m_document, QStringLiteral("FormFeed"), {}, error); }

private:
    std::shared_ptr<AutomationObject> m_document;
};

class BarTender : public LabelProgram {
public:
    BarTender()
        : LabelProgram(QStringLiteral("BarTender.Application"))
    {
    }

    bool switchIn(const QString& file, bool, RunTrace&, QString* error) override
    {
        if (!m_app->setProperty(QStringLiteral("Visible"), false, error))
            return false;
        m_formats = m_app->object(QStringLiteral("Formats"), {}, error);
        if (!m_formats)
            return false;
        m_format = m_formats->object(QStringLiteral("Open"), {file, false, QString()}, error);
        return m_format != nullptr;
    }

    bool setVariable(const QString& name, const QString& text, RunTrace&, QString* error) override
    {
        return call(*m_format, QStringLiteral("SetNamedSubStringValue"), {name, text}, error);
    }

    bool printRecord(int copies, RunTrace&, QString* error) override { return print(copies, error); }
    bool printHeader(RunTrace&, QString* error) override { return print(1, error); }

    bool switchOut(bool, RunTrace&, QString* error) override
    {
        return call(*m_format, QStringLiteral("Close"), {1}, error);
    }

    bool end(RunTrace&, QString* error) override { return call(*m_app, QStringLiteral("Quit"), {1}, error); }

private:
    bool print(int copies, QString* error)
    {
        return m_format->setProperty(QStringLiteral("IdenticalCopiesOfLabel"), copies, error)
            && call(*m_format, QStringLiteral("PrintOut"), {true, false}, error);
    }

    std::shared_ptr<AutomationObject> m_formats;
    std::shared_ptr<AutomationObject> m_format;
};

class NiceLabel : public LabelProgram {
public:
    explicit NiceLabel(bool sheets)
        : LabelProgram(QStringLiteral("NiceLabel.Application"))
        , m_sheets(sheets)
    {
    }

    bool switchIn(const QString& file, bool header, RunTrace& trace, QString* error) override
    {
        trace.step = header ? 15 : 5;
        QVariant id;
        if (!call(*m_app, QStringLiteral("LabelOpen"), {file}, error, &id))
            return false;
        trace.labelId = id.toLongLong();
        if (!m_sheets)
            return true;
        trace.step = header ? 16 : 6;
        return call(*m_app, QStringLiteral("LabelSessionStart"), {trace.labelId}, error);
    }

    bool setVariable(const QString& name, const QString& text, RunTrace& trace, QString* error) override
    {
        // One list for every variable of the run, its changing places set in
        // place (the values' storage is reused): a run sends tens of fields
        // per record.
        if (m_setVarArgs.isEmpty()) {
            m_setVarArgs = {trace.labelId, name, text, -9999, -9999};
        } else {
            QVariant* args = m_setVarArgs.data();
            if (*static_cast<const qlonglong*>(args[0].constData()) != trace.labelId)
                args[0].setValue(trace.labelId);
            args[1].setValue(name);
            args[2].setValue(text);
        }
        return call(*m_app, QStringLiteral("LabelSetVar"), m_setVarArgs, error);
    }

    bool printRecord(int copies, RunTrace& trace, QString* error) override
    {
        trace.step = 8;
        return print(QString::number(copies) + QStringLiteral(",0"), trace, error);
    }

    bool printHeader(RunTrace& trace, QString* error) override
    {
        trace.step = 18;
        return print(QStringLiteral("1,0"), trace, error);
    }

    bool switchOut(bool beforeHeader, RunTrace& trace, QString* error) override
    {
        return close(beforeHeader ? 13 : 3, beforeHeader ? 14 : 4, trace, error);
    }

    bool end(RunTrace& trace, QString* error) override
    {
        if (!close(10, 11, trace, error))
            return false;
        trace.step = 12;
        return call(*m_app, QStringLiteral("Quit"), {}, error);
    }

private:
    bool print(const QString& quantity, RunTrace& trace, QString* error)
    {
        return call(*m_app, m_sheets ? QStringLiteral("LabelSessionPrint") : QStringLiteral("LabelPrint"),
                    {trace.labelId, quantity}, error);
    }

    bool close(int endStep, int closeStep, RunTrace& trace, QString* error)
    {
        if (m_sheets) {
            trace.step = endStep;
            if (!call(*m_app, QStringLiteral("LabelSessionEnd"), {trace.labelId}, error))
                return false;
        }
        trace.step = closeStep;
        return call(*m_app, QStringLiteral("LabelClose"), {trace.labelId}, error);
    }

    bool m_sheets;
    QVariantList m_setVarArgs;
};

// Collects records (one AddRecord before each after the first, a quantity per
// record) and prints them together: at the end, before a header label, and
// before another label file is opened, since opening drops what was collected.
class FastLabel : public LabelProgram {
public:
    FastLabel()
        : LabelProgram(QStringLiteral("FastLabel.FastLabelX"))
    {
    }

    bool switchIn(const QString& file, bool header, RunTrace& trace, QString* error) override
    {
        trace.step = header ? 15 : 5;
        m_firstRecord = true;
        return call(*m_app, QStringLiteral("LabelOpen"), {file, QString()}, error);
    }

    bool beforeRecord(RunTrace&, QString* error) override
    {
        return m_firstRecord || call(*m_app, QStringLiteral("AddRecord"), {}, error);
    }

    bool setVariable(const QString& name, const QString& text, RunTrace&, QString* error) override
    {
        return call(*m_app, QStringLiteral("LabelSetVar"), {name, text}, error);
    }

    bool printRecord(int copies, RunTrace&, QString* error) override
    {
        if (!m_app->setProperty(QStringLiteral("LabelQty"), copies, error))
            return false;
        m_firstRecord = false;
        return true;
    }

    bool printHeader(RunTrace& trace, QString* error) override
    {
        trace.step = 18;
        if (!m_app->setProperty(QStringLiteral("LabelQty"), 1, error)
            || !call(*m_app, QStringLiteral("LabelPrint"), {}, error))
            return false;
        m_firstRecord = true;
        return true;
    }

    bool switchOut(bool beforeHeader, RunTrace& trace, QString* error) override
    {
        if (!beforeHeader) {
            trace.step = 4;
            // Only records collected since the last open or print are pending.
            const bool pending = !m_firstRecord;
            m_firstRecord = true;
            return !pending || call(*m_app, QStringLiteral("LabelPrint"), {}, error);
        }
        trace.step = 12;
        return call(*m_app, QStringLiteral("LabelPrint"), {}, error);
    }

    bool end(RunTrace& trace, QString* error) override
    {
        trace.step = 10;
        return call(*m_app, QStringLiteral("LabelPrint"), {}, error);
    }

private:
    bool m_firstRecord = true;
};

} // namespace

QString LabelProgram::progId(int code)
{
    switch (code) {
    case 5: return QStringLiteral("NiceLabel.Application");
    case 2: return QStringLiteral("LPPX.Application");
    case 4: return QStringLiteral("BarTender.Application");
    case 7: return QStringLiteral("FastLabel.FastLabelX");
    default: return QString();
    }
}

std::unique_ptr<LabelProgram> LabelProgram::forCode(int code, bool sheets)
{
    switch (code) {
    case 5: return std::make_unique<NiceLabel>(sheets);
    case 2: return std::make_unique<CodeSoft>();
    case 4: return std::make_unique<BarTender>();
    case 7: return std::make_unique<FastLabel>();
    default: return nullptr;
    }
}

bool LabelProgram::start(const AutomationRegistry& registry, RunTrace& trace, QString* error)
{
    trace.step = 2;
    m_app = registry.create(m_progId, error);
    return m_app != nullptr;
}

QString labelFileFilter(int programCode)
{
    switch (programCode) {
    case 5: return QStringLiteral("All Files (*.*)|*.*|NiceLabel Files (*.lbl)|*.lbl");
    case 2: return QStringLiteral("All Files (*.*)|*.*|CodeSoft Files (*.lab)|*.lab");
    case 4: return QStringLiteral("All Files (*.*)|*.*|BarTender Files (*.btw)|*.btw");
    case 7: return QStringLiteral("All Files (*.*)|*.*|FastLabel Files (*.lbl)|*.lbl");
    case 1: return QStringLiteral("All Files (*.*)|*.*|Venmar Definitions (*.tds)|*.tds");
    default: return QString();
    }
}

QString ChooseLabelFile(int programCode, CommonDialog* dialog, bool promptCreate)
{
    if (!dialog)
        return QString();
    dialog->flags = promptCreate ? CommonDialog::CreatePrompt : CommonDialog::HideReadOnly;
    dialog->filter = labelFileFilter(programCode);
    dialog->filterIndex = 2;
    dialog->fileName.clear();
    if (!dialog->showOpen())
        return QString();
    return dialog->fileName;
}

} // namespace tagora
