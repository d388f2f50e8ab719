// The headless host: creates the control without a screen, runs its creation
// and show steps, then a sequence of verbs in that one instance:
//   set NAME VALUE | get NAME | click NAME | dblclick NAME | call METHOD [ARG...]
//   additem NAME TEXT | grab FILE | setcell GRID ROW COL VALUE | getcell GRID ROW COL
// Options: --settings FILE, --answer yes|no, --file PATH, --script FILE|-,
//   --demo DIR (with --demo-items N, --demo-type 1|2 before it).
// A dialog that a command opens takes the verbs that follow until one of them
// closes it; verbs name the dialog's controls first, then the control's.
#include "cards/tagorainfo.h"
#include "control/maincard.h"
#include "control/settingstable.h"
#include "labels/glabelsbridge.h"
#include "erp/demosetup.h"
#include "platform/controlbinding.h"
#include "platform/filedialog.h"
#include "platform/namedcontrols.h"
#include "platform/pageviewer.h"
#include "platform/printdialog.h"
#include "platform/prompt.h"
#include "platform/settingsstore.h"

#include <QAbstractItemView>
#include <QApplication>
#include <QComboBox>
#include <QDialog>
#include <QDir>
#include <QFile>
#include <QTextStream>
#include <cstdio>
#include <memory>

namespace {

using namespace tagora;

const QStringList kVerbs = {"set",   "get",     "click", "dblclick", "call",   "call-info",
                            "additem", "grab", "setcell", "getcell", "clickcell"};

void out(const QString& text)
{
    const QByteArray b = text.toUtf8();
    std::fwrite(b.constData(), 1, size_t(b.size()), stdout);
    std::fputc('\n', stdout);
    std::fflush(stdout);
}

void err(const QString& text)
{
    const QByteArray b = (QStringLiteral("tagora-cli: ") + text).toUtf8();
    std::fwrite(b.constData(), 1, size_t(b.size()), stderr);
    std::fputc('\n', stderr);
    std::fflush(stderr);
}

// Qt's own chatter (no runtime folder, no window system) would mix with the
// message-box lines on standard error; keep only real failures unless asked.
void quietHandler(QtMsgType type, const QMessageLogContext&, const QString& msg)
{
    if (type == QtCriticalMsg || type == QtFatalMsg || qEnvironmentVariableIsSet("TAGORA_DEBUG"))
        err(msg);
}

// Splits a script line like a shell would: quotes group, a backslash escapes.
QStringList splitLine(const QString& line)
{
    QStringList words;
    QString word;
    bool inWord = false;
    QChar quote;
    for (int i = 0; i < line.size(); ++i) {
        const QChar c = line[i];
        if (!quote.isNull()) {
            if (c == quote)
                quote = QChar();
            else if (c == QLatin1Char('\\') && quote == QLatin1Char('"') && i + 1 < line.size())
                word += line[++i];
            else
                word += c;
        } else if (c == QLatin1Char('"') || c == QLatin1Char('\'')) {
            quote = c;
            inWord = true;
        } else if (c == QLatin1Char('\\') && i + 1 < line.size()) {
            word += line[++i];
            inWord = true;
        } else if (c.isSpace()) {
            if (inWord)
                words << word;
            word.clear();
            inWord = false;
        } else if (c == QLatin1Char('#') && !inWord) {
            break;
        } else {
            word += c;
            inWord = true;
        }
    }
    if (inWord)
        words << word;
    return words;
}

bool readScript(const QString& path, QStringList* tokens)
{
    QFile f;
    if (path == QLatin1String("-")) {
        if (!f.open(stdin, QIODevice::ReadOnly))
            return false;
    } else {
        f.setFileName(path);
        if (!f.open(QIODevice::ReadOnly))
            return false;
    }
    QTextStream in(&f);
    while (!in.atEnd())
        *tokens << splitLine(in.readLine());
    return true;
}

// Without a screen there is no browser to open: the page's path is printed.
class PrintedPages : public PageViewer {
public:
    bool showPage(const QString& path, QString*) override
    {
        out(QStringLiteral("page: ") + QDir::toNativeSeparators(path));
        return true;
    }
    // The window would move on to the page: its path is printed the same way.
    bool navigate(const QString&, const QString& to, QString*) override
    {
        out(QStringLiteral("page: ") + QDir::toNativeSeparators(to));
        return true;
    }
};

class Interpreter : public DialogRunner {
public:
    explicit Interpreter(QStringList tokens)
        : m_tokens(std::move(tokens))
    {
    }

    int exec()
    {
        while (m_pos < m_tokens.size() && !m_failed)
            step();
        if (!m_failed)
            ensureCard();
        if (m_failed)
            return 2;
        return m_prompt->criticalCount() > 0 ? 1 : 0;
    }

    // A dialog opened by a command takes the verbs that follow until closed.
    int run(QDialog& dialog) override
    {
        dialog.show();
        m_scopes.push_back(&dialog);
        while (dialog.isVisible() && m_pos < m_tokens.size() && !m_failed)
            step();
        if (dialog.isVisible())
            dialog.reject();
        m_scopes.pop_back();
        return dialog.result();
    }

private:
    bool has(int count) const { return m_pos + count <= m_tokens.size(); }
    QString take() { return m_tokens[m_pos++]; }

    void usage(const QString& why = QString())
    {
        if (!why.isEmpty())
            err(why);
        err(QStringLiteral("usage: tagora-cli [--settings FILE] [--answer yes|no] [--file PATH] [--script FILE|-] "
                           "[--demo-items N] [--demo-type 1|2] [--demo DIR] [set NAME VALUE | get NAME | click NAME | "
                           "dblclick NAME | call METHOD [ARG...] | call-info METHOD [ARG...] | additem NAME TEXT | grab FILE | "
                           "setcell GRID ROW COL VALUE | getcell GRID ROW COL | clickcell GRID ROW COL]..."));
        m_failed = true;
    }

    void fail(const QString& why)
    {
        err(why);
        m_failed = true;
    }

    SettingsStore& store()
    {
        if (!m_store)
            m_store = defaultSettingsStore();
        return *m_store;
    }

    void ensureCard()
    {
        if (m_card)
            return;
        Services services;
        services.settings = m_store ? m_store : defaultSettingsStore();
        m_store = services.settings;
        services.prompt = m_prompt;
        services.fileDialog = m_files;
        services.printDialog = std::make_shared<ScriptedPrintDialog>(m_files.get());
        services.pages = m_pages;
        // The card lives as long as this interpreter, which outlives every use of it.
        services.dialogs = std::shared_ptr<DialogRunner>(this, [](DialogRunner*) {});
        m_card = std::make_unique<MainCard>(nullptr, services);
        QObject::connect(m_card.get(), &MainCard::messageChanged, [](const QString& text) {
            if (!text.isEmpty())
                out(text);
        });
        m_card->resize(m_card->sizeHint().expandedTo(QSize(1280, 600)));
        m_card->show();
        // What the show step reports (an ERP that cannot be reached, say) is
        // shown, but the exit status speaks of the commands that follow.
        m_prompt->clear();
    }

    QObject* find(const QString& name) const
    {
        for (auto it = m_scopes.rbegin(); it != m_scopes.rend(); ++it)
            if (QObject* o = findControl(*it, name))
                return o;
        return m_card ? m_card->control(name) : nullptr;
    }

    struct Target {
        QObject* control = nullptr;
        std::optional<BindKind> kind;
        QString property;
    };

    // "NAME" or "NAME.Property"; without a property, the kind the settings
    // store uses for that control, else the control's natural one.
    Target resolve(const QString& address, QString* error) const
    {
        Target t;
        QString name = address;
        const int dot = address.lastIndexOf(QLatin1Char('.'));
        if (dot > 0 && !address.mid(dot + 1).contains(QLatin1Char(')'))) {
            name = address.left(dot);
            t.property = address.mid(dot + 1);
        }
        t.control = find(name);
        if (!t.control) {
            *error = QStringLiteral("no control named '%1'").arg(name);
            return t;
        }
        static const std::pair<const char*, BindKind> props[] = {
            {"Text", BindKind::Text}, {"ListIndex", BindKind::ListIndex},
            {"Value", BindKind::Value}, {"Caption", BindKind::Caption}};
        if (t.property.isEmpty()) {
            t.kind = addressKind(t.control);
            return t;
        }
        for (const auto& [p, k] : props)
            if (t.property == QLatin1String(p))
                t.kind = k;
        if (!t.kind && t.property != QLatin1String("Tag") && t.property != QLatin1String("ListCount")) {
            *error = QStringLiteral("unknown property '%1'").arg(t.property);
            t.control = nullptr;
        }
        return t;
    }

    void step()
    {
        const QString t = take();
        if (t == QLatin1String("--settings")) {
            if (!has(1))
                return usage();
            if (m_card)
                return fail(QStringLiteral("--settings must come before the first verb"));
            m_store = std::make_shared<IniSettingsStore>(take());
        } else if (t == QLatin1String("--answer")) {
            if (!has(1))
                return usage();
            const QString a = take().toLower();
            if (a != QLatin1String("yes") && a != QLatin1String("no"))
                return usage(QStringLiteral("--answer takes yes or no"));
            m_prompt->setDefaultAnswer(a == QLatin1String("yes"));
        } else if (t == QLatin1String("--file")) {
            if (!has(1))
                return usage();
            m_files->queue(take());
        } else if (t == QLatin1String("--script")) {
            if (!has(1))
                return usage();
            const QString path = take();
            QStringList more;
            if (!readScript(path, &more))
                return fail(QStringLiteral("cannot read script %1").arg(path));
            for (int k = 0; k < more.size(); ++k)
                m_tokens.insert(m_pos + k, more[k]);
        } else if (t == QLatin1String("--demo-items") || t == QLatin1String("--demo-type")) {
            bool ok = false;
            const int n = has(1) ? take().toInt(&ok) : 0;
            if (!ok || n < 0 || (t == QLatin1String("--demo-type") && n != 1 && n != 2))
                return usage(QStringLiteral("%1 takes a number").arg(t));
            if (t == QLatin1String("--demo-items"))
                m_demo.items = n;
            else
                m_demo.connType = short(n);
        } else if (t == QLatin1String("--demo")) {
            if (!has(1))
                return usage();
            if (m_card)
                return fail(QStringLiteral("--demo must come before the first verb"));
            const QString dir = take();
            QString e = SetupDemoCompany(dir, m_demo, store());
            // The sample labels of the two bridges, for a user to choose as label files.
            for (const char* sample : {"demo-item.glabels", "demo-item.zpl"})
                if (e.isEmpty() && DemoLabel(QDir(dir).filePath(QStringLiteral("labels")), QLatin1String(sample), &e).isEmpty())
                    break;
            if (!e.isEmpty())
                return fail(e);
            out(QStringLiteral("demo company ready in %1 (data source %2)").arg(dir, kDemoDsn));
        } else if (t == QLatin1String("--help") || t == QLatin1String("-h")) {
            usage();
            m_failed = false;
            m_pos = int(m_tokens.size());
        } else if (kVerbs.contains(t)) {
            ensureCard();
            verb(t);
            QCoreApplication::processEvents();
        } else {
            usage(QStringLiteral("unknown verb '%1'").arg(t));
        }
    }

    void verb(const QString& t)
    {
        QString error;
        if (t == QLatin1String("set")) {
            if (!has(2))
                return usage();
            const QString name = take();
            const QString value = take();
            const Target target = resolve(name, &error);
            if (!target.control || !target.kind)
                return fail(error.isEmpty() ? QStringLiteral("%1 cannot be set").arg(name) : error);
            if (!writeBound(target.control, *target.kind, value))
                return fail(QStringLiteral("%1 refused the value '%2'").arg(name, value));
        } else if (t == QLatin1String("get")) {
            if (!has(1))
                return usage();
            const QString name = take();
            const Target target = resolve(name, &error);
            if (!target.control)
                return fail(error);
            if (target.property == QLatin1String("Tag")) {
                out(target.control->property("Tag").toString());
            } else if (target.property == QLatin1String("ListCount")) {
                auto* combo = qobject_cast<QComboBox*>(target.control);
                out(QString::number(combo ? combo->count() : 0));
            } else {
                const auto value = target.kind ? readBound(target.control, *target.kind) : std::nullopt;
                if (!value)
                    return fail(QStringLiteral("%1 has no such value").arg(name));
                out(*value);
            }
        } else if (t == QLatin1String("click") || t == QLatin1String("dblclick")) {
            if (!has(1))
                return usage();
            const QString name = take();
            QObject* c = find(name);
            if (!c)
                return fail(QStringLiteral("no control named '%1'").arg(name));
            const bool ok = t == QLatin1String("click")
                ? clickControl(c)
                : QMetaObject::invokeMethod(c, "doubleClicked", Qt::DirectConnection);
            if (!ok)
                return fail(QStringLiteral("%1 cannot be clicked").arg(name));
        } else if (t == QLatin1String("call") || t == QLatin1String("call-info")) {
            if (!has(1))
                return usage();
            const QString method = take();
            // call-info speaks to the public local item card class, as a host that created one would.
            if (t == QLatin1String("call-info") && !m_info)
                m_info = std::make_unique<TagoraInfo>(m_pages, m_prompt);
            QObject* target = t == QLatin1String("call") ? static_cast<QObject*>(m_card.get()) : m_info.get();
            const auto arity = methodArity(target, method);
            if (!arity)
                return fail(QStringLiteral("no public method named '%1'").arg(method));
            QStringList args;
            // Required arguments are taken as they come; optional ones only up to the next verb.
            while (args.size() < arity->second && has(1)
                   && (args.size() < arity->first
                       || (!kVerbs.contains(m_tokens[m_pos]) && !m_tokens[m_pos].startsWith(QLatin1String("--")))))
                args << take();
            const CallResult r = callMethod(target, method, args);
            if (!r.ok)
                return fail(r.error);
            if (r.hasValue)
                out(variantText(r.value));
        } else if (t == QLatin1String("additem")) {
            if (!has(2))
                return usage();
            const QString name = take();
            const QString text = take();
            auto* combo = qobject_cast<QComboBox*>(find(name));
            if (!combo)
                return fail(QStringLiteral("%1 is not a list").arg(name));
            combo->addItem(text);
        } else if (t == QLatin1String("clickcell")) {
            if (!has(3))
                return usage();
            const QString name = take();
            const int row = take().toInt();
            const int col = take().toInt();
            auto* view = qobject_cast<QAbstractItemView*>(find(name));
            const QModelIndex index = view && view->model() ? view->model()->index(row - 1, col) : QModelIndex();
            if (!index.isValid())
                return fail(QStringLiteral("%1 has no cell %2, %3").arg(name).arg(row).arg(col));
            // As a user's click: the row becomes current, then the grid hears the click.
            view->setCurrentIndex(index);
            emit view->clicked(index);
        } else if (t == QLatin1String("setcell") || t == QLatin1String("getcell")) {
            // Grid rows count as the grid shows them: row 0 is the header, data from 1.
            const bool write = t == QLatin1String("setcell");
            if (!has(write ? 4 : 3))
                return usage();
            const QString name = take();
            bool rowOk = false, colOk = false;
            const int row = take().toInt(&rowOk);
            const int col = take().toInt(&colOk);
            const QString value = write ? take() : QString();
            auto* view = qobject_cast<QAbstractItemView*>(find(name));
            QAbstractItemModel* model = view ? view->model() : nullptr;
            if (!model)
                return fail(QStringLiteral("%1 is not a grid").arg(name));
            const QModelIndex index = model->index(row - 1, col);
            if (!rowOk || !colOk || !index.isValid())
                return fail(QStringLiteral("%1 has no cell %2, %3").arg(name).arg(row).arg(col));
            const bool check = model->flags(index).testFlag(Qt::ItemIsUserCheckable);
            if (!write) {
                out(check ? QString::number(model->data(index, Qt::CheckStateRole).toInt() == Qt::Checked ? 1 : 0)
                          : model->data(index, Qt::DisplayRole).toString());
                return;
            }
            // Typing into a cell moves there first, as a user's click does: a
            // grid that follows its current row (documents and their lines) follows it.
            view->setCurrentIndex(index);
            const bool ok = check ? model->setData(index, value.toInt() != 0 ? Qt::Checked : Qt::Unchecked, Qt::CheckStateRole)
                                  : model->setData(index, value, Qt::EditRole);
            if (!ok)
                return fail(QStringLiteral("%1 refused the value '%2' in cell %3, %4").arg(name, value).arg(row).arg(col));
        } else if (t == QLatin1String("grab")) {
            if (!has(1))
                return usage();
            const QString file = take();
            QWidget* w = m_scopes.empty() ? static_cast<QWidget*>(m_card.get()) : m_scopes.back();
            if (!w->grab().save(file))
                return fail(QStringLiteral("cannot write %1").arg(file));
        }
    }

    QStringList m_tokens;
    int m_pos = 0;
    bool m_failed = false;
    std::shared_ptr<ScriptedPrompt> m_prompt = std::make_shared<ScriptedPrompt>(stderr);
    std::shared_ptr<ScriptedFileDialog> m_files = std::make_shared<ScriptedFileDialog>();
    std::shared_ptr<SettingsStore> m_store;
    DemoOptions m_demo;
    std::shared_ptr<PrintedPages> m_pages = std::make_shared<PrintedPages>();
    std::unique_ptr<MainCard> m_card;
    std::unique_ptr<TagoraInfo> m_info;
    std::vector<QWidget*> m_scopes;
};

} // namespace

int main(int argc, char** argv)
{
    // Headless by nature: no display is needed or used unless one is asked for.
    if (qEnvironmentVariableIsEmpty("QT_QPA_PLATFORM"))
        qputenv("QT_QPA_PLATFORM", "offscreen");
    qInstallMessageHandler(quietHandler);
    QApplication app(argc, argv);
    QApplication::setApplicationName(QStringLiteral("Tagora"));
    QApplication::setLayoutDirection(Qt::RightToLeft);
    Interpreter interpreter(app.arguments().mid(1));
    return interpreter.exec();
}
