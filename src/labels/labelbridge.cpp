#include "labels/labelbridge.h"

namespace tagora {

namespace {

// What all the objects of one program share: the sink and the open file.
struct Session {
    std::unique_ptr<LabelSink> sink;
    QString file;
    bool open = false;
    long long nextLabelId = 1;
    int copies = 1; // BarTender's IdenticalCopiesOfLabel

    bool openLabel(const QString& name, QString* error)
    {
        // A program opens a file over another only after closing it; if a
        // program is told to, what the old file collected still goes out.
        if (open && !closeLabel(error))
            return false;
        if (!sink->openLabel(name, error))
            return false;
        file = name;
        open = true;
        return true;
    }
    bool closeLabel(QString* error)
    {
        if (!open)
            return true;
        open = false;
        return sink->closeLabel(error);
    }
    bool ensureOpen(QString* error)
    {
        if (open)
            return true;
        if (file.isEmpty()) {
            *error = QStringLiteral("לא נפתח קובץ מדבקה");
            return false;
        }
        return openLabel(file, error);
    }
    bool setVariable(const QString& name, const QString& value, QString* error)
    {
        return ensureOpen(error) && sink->setVariable(name, value, error);
    }
    bool print(int count, QString* error) { return ensureOpen(error) && sink->printRecord(count, error); }
};

enum class Kind { NiceLabel, CodeSoft, CodeSoftDocument, CodeSoftVariable, BarTender, Formats, Format, FastLabel };

bool argCount(const QString& member, const QVariantList& args, int least, QString* error)
{
    if (args.size() >= least)
        return true;
    *error = QStringLiteral("חסרים ערכים בקריאה ל-%1").arg(member);
    return false;
}

// Automation names are matched as the programs match them, without regard to case.
bool named(const QString& member, const char* name)
{
    return member.compare(QLatin1String(name), Qt::CaseInsensitive) == 0;
}

// NiceLabel's quantity text: copies, a comma, and a zero ("3,0").
int quantityCopies(const QVariant& quantity)
{
    return quantity.toString().section(QLatin1Char(','), 0, 0).trimmed().toInt();
}

class ProgramObject : public AutomationObject {
public:
    ProgramObject(std::shared_ptr<Session> session, Kind kind, QString progId, QString name = QString())
        : m_session(std::move(session))
        , m_kind(kind)
        , m_progId(std::move(progId))
        , m_name(std::move(name))
    {
    }

    bool call(const QString& member, const QVariantList& args, QVariant* result, QString* error) override
    {
        Session& s = *m_session;
        auto is = [&member](const char* name) { return named(member, name); };
        switch (m_kind) {
        case Kind::NiceLabel:
            if (is("LabelOpen")) {
                if (!argCount(member, args, 1, error) || !s.openLabel(args[0].toString(), error))
                    return false;
                if (result)
                    *result = s.nextLabelId++;
                return true;
            }
            if (is("LabelSetVar"))
                return argCount(member, args, 3, error) && s.setVariable(args[1].toString(), args[2].toString(), error);
            if (is("LabelPrint") || is("LabelSessionPrint"))
                return argCount(member, args, 2, error) && s.print(quantityCopies(args[1]), error);
            if (is("LabelSessionStart") || is("LabelSessionEnd"))
                return true;
            if (is("LabelClose") || is("Quit"))
                return s.closeLabel(error);
            break;
        case Kind::CodeSoftDocument:
            if (is("Open"))
                return argCount(member, args, 1, error) && s.openLabel(args[0].toString(), error);
            if (is("PrintLabel"))
                return argCount(member, args, 1, error) && s.print(args[0].toInt(), error);
            // The form feed ends the run (and comes before a close): what was collected goes out.
            if (is("FormFeed"))
                return s.closeLabel(error);
            if (is("Close"))
                return true;
            break;
        case Kind::BarTender:
            if (is("Quit"))
                return s.closeLabel(error);
            break;
        case Kind::Format:
            if (is("SetNamedSubStringValue"))
                return argCount(member, args, 2, error) && s.setVariable(args[0].toString(), args[1].toString(), error);
            if (is("PrintOut"))
                return s.print(s.copies, error);
            if (is("Close"))
                return s.closeLabel(error);
            break;
        case Kind::FastLabel:
            if (is("LabelOpen"))
                return argCount(member, args, 1, error) && s.openLabel(args[0].toString(), error);
            if (is("LabelSetVar"))
                return argCount(member, args, 2, error) && s.setVariable(args[0].toString(), args[1].toString(), error);
            // Records are complete when their quantity is set; the sink
            // collects them, and LabelPrint sends what was collected.
            if (is("AddRecord"))
                return true;
            if (is("LabelPrint"))
                return s.closeLabel(error);
            break;
        default:
            break;
        }
        return unknown(member, error);
    }

    std::shared_ptr<AutomationObject> object(const QString& member, const QVariantList& args, QString* error) override
    {
        auto is = [&member](const char* name) { return named(member, name); };
        const QString path = m_progId + QLatin1Char('.') + member;
        if (m_kind == Kind::CodeSoft && is("ActiveDocument"))
            return std::make_shared<ProgramObject>(m_session, Kind::CodeSoftDocument, path);
        if (m_kind == Kind::CodeSoftDocument && is("Variables") && argCount(member, args, 1, error))
            return std::make_shared<ProgramObject>(m_session, Kind::CodeSoftVariable, path, args[0].toString());
        if (m_kind == Kind::BarTender && is("Formats"))
            return std::make_shared<ProgramObject>(m_session, Kind::Formats, path);
        if (m_kind == Kind::Formats && is("Open") && argCount(member, args, 1, error)) {
            if (!m_session->openLabel(args[0].toString(), error))
                return nullptr;
            return std::make_shared<ProgramObject>(m_session, Kind::Format, path);
        }
        if (error->isEmpty())
            unknown(member, error);
        return nullptr;
    }

    bool setProperty(const QString& name, const QVariant& value, QString* error) override
    {
        Session& s = *m_session;
        auto is = [&name](const char* n) { return named(name, n); };
        if ((m_kind == Kind::CodeSoft || m_kind == Kind::BarTender) && is("Visible"))
            return true;
        if (m_kind == Kind::CodeSoftVariable && is("Value"))
            return s.setVariable(m_name, value.toString(), error);
        if (m_kind == Kind::Format && is("IdenticalCopiesOfLabel")) {
            s.copies = value.toInt();
            return true;
        }
        if (m_kind == Kind::FastLabel && is("LabelQty"))
            return s.print(value.toInt(), error);
        return unknown(name, error);
    }

private:
    bool unknown(const QString& member, QString* error) const
    {
        *error = QStringLiteral("לגשר ההדפסה אין את האיבר %1 של %2").arg(member, m_progId);
        return false;
    }

    std::shared_ptr<Session> m_session;
    Kind m_kind;
    QString m_progId;
    QString m_name; // a CodeSoft variable's name
};

} // namespace

BridgeProvider::BridgeProvider(LabelSinkFactory factory)
    : m_factory(std::move(factory))
{
}

std::shared_ptr<AutomationObject> BridgeProvider::create(const QString& progId, QString* error)
{
    static const std::pair<const char*, Kind> programs[] = {{"NiceLabel.Application", Kind::NiceLabel},
                                                            {"LPPX.Application", Kind::CodeSoft},
                                                            {"BarTender.Application", Kind::BarTender},
                                                            {"FastLabel.FastLabelX", Kind::FastLabel}};
    for (const auto& [id, kind] : programs) {
        if (!named(progId, id))
            continue;
        auto session = std::make_shared<Session>();
        session->sink = m_factory ? m_factory(progId) : nullptr;
        if (!session->sink) {
            *error = QStringLiteral("לא ניתן להכין את גשר ההדפסה עבור %1").arg(progId);
            return nullptr;
        }
        return std::make_shared<ProgramObject>(std::move(session), kind, progId);
    }
    *error = QStringLiteral("גשר ההדפסה אינו משרת את %1").arg(progId);
    return nullptr;
}

} // namespace tagora
