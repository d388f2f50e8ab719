// The headless host: creates the control without a screen, runs its creation
// and show steps, then a sequence of verbs in that one instance:
//   set NAME VALUE | get NAME | click NAME | call METHOD [ARG...]
//   additem NAME TEXT | grab FILE
// Options: --settings FILE, --answer yes|no, --file PATH, --script FILE|-
#include "control/automation.h"
#include "control/commondialog.h"
#include "control/controlbinding.h"
#include "control/maincard.h"
#include "control/prompt.h"
#include "control/settingsstore.h"
#include "control/settingstable.h"

#include <QApplication>
#include <QComboBox>
#include <QFile>
#include <QTextStream>
#include <cstdio>
#include <memory>

namespace {

using namespace tagora;

const QStringList kVerbs = {"set", "get", "click", "call", "additem", "grab"};

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

struct Target {
    QObject* control = nullptr;
    std::optional<BindKind> kind;
    QString property;
};

// "NAME" or "NAME.Property"; without a property, the kind the settings store
// uses for that control, else the control's natural one.
Target resolve(MainCard* card, const QString& address, QString* error)
{
    Target t;
    QString name = address;
    const int dot = address.lastIndexOf(QLatin1Char('.'));
    if (dot > 0 && !address.mid(dot + 1).contains(QLatin1Char(')'))) {
        name = address.left(dot);
        t.property = address.mid(dot + 1);
    }
    t.control = card->control(name);
    if (!t.control) {
        *error = QStringLiteral("no control named '%1'").arg(name);
        return t;
    }
    if (t.property.isEmpty()) {
        t.kind = addressKind(t.control);
    } else if (t.property == QLatin1String("Text")) {
        t.kind = BindKind::Text;
    } else if (t.property == QLatin1String("ListIndex")) {
        t.kind = BindKind::ListIndex;
    } else if (t.property == QLatin1String("Value")) {
        t.kind = BindKind::Value;
    } else if (t.property == QLatin1String("Caption")) {
        t.kind = BindKind::Caption;
    } else if (t.property != QLatin1String("Tag") && t.property != QLatin1String("ListCount")) {
        *error = QStringLiteral("unknown property '%1'").arg(t.property);
        t.control = nullptr;
    }
    return t;
}

int usage()
{
    err(QStringLiteral("usage: tagora-cli [--settings FILE] [--answer yes|no] [--file PATH] [--script FILE|-] "
                       "[set NAME VALUE | get NAME | click NAME | call METHOD [ARG...] | additem NAME TEXT | "
                       "grab FILE]..."));
    return 2;
}

// Qt's own chatter (no runtime folder, no window system) would mix with the
// message-box lines on standard error; keep only real failures unless asked.
void quietHandler(QtMsgType type, const QMessageLogContext&, const QString& msg)
{
    if (type == QtCriticalMsg || type == QtFatalMsg || qEnvironmentVariableIsSet("TAGORA_DEBUG"))
        err(msg);
}

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

    QStringList tokens = app.arguments().mid(1);
    auto prompt = std::make_shared<ScriptedPrompt>(stderr);
    auto files = std::make_shared<ScriptedFileDialog>();
    std::shared_ptr<SettingsStore> store;
    std::unique_ptr<MainCard> card;

    auto needArg = [&](int i, int count) { return i + count < tokens.size(); };
    auto ensureCard = [&] {
        if (card)
            return;
        Services services;
        services.settings = store ? store : defaultSettingsStore();
        services.prompt = prompt;
        services.fileDialog = files;
        card = std::make_unique<MainCard>(nullptr, services);
        QObject::connect(card.get(), &MainCard::messageChanged, [](const QString& text) {
            if (!text.isEmpty())
                out(text);
        });
        card->resize(card->sizeHint().expandedTo(QSize(1280, 600)));
        card->show();
    };

    for (int i = 0; i < tokens.size(); ++i) {
        const QString t = tokens[i];
        if (t == QLatin1String("--help") || t == QLatin1String("-h"))
        {
            usage();
            return 0;
        }
        if (t == QLatin1String("--settings")) {
            if (!needArg(i, 1))
                return usage();
            if (card) {
                err(QStringLiteral("--settings must come before the first verb"));
                return 2;
            }
            store = std::make_shared<IniSettingsStore>(tokens[++i]);
            continue;
        }
        if (t == QLatin1String("--answer")) {
            if (!needArg(i, 1))
                return usage();
            const QString a = tokens[++i].toLower();
            if (a != QLatin1String("yes") && a != QLatin1String("no"))
                return usage();
            prompt->setDefaultAnswer(a == QLatin1String("yes"));
            continue;
        }
        if (t == QLatin1String("--file")) {
            if (!needArg(i, 1))
                return usage();
            files->queue(tokens[++i]);
            continue;
        }
        if (t == QLatin1String("--script")) {
            if (!needArg(i, 1))
                return usage();
            QStringList more;
            if (!readScript(tokens[++i], &more)) {
                err(QStringLiteral("cannot read script %1").arg(tokens[i]));
                return 2;
            }
            for (int k = 0; k < more.size(); ++k)
                tokens.insert(i + 1 + k, more[k]);
            continue;
        }
        if (!kVerbs.contains(t)) {
            err(QStringLiteral("unknown verb '%1'").arg(t));
            return usage();
        }

        ensureCard();

        QString error;
        if (t == QLatin1String("set")) {
            if (!needArg(i, 2))
                return usage();
            const Target target = resolve(card.get(), tokens[i + 1], &error);
            const QString value = tokens[i + 2];
            i += 2;
            if (!target.control || !target.kind) {
                err(error.isEmpty() ? QStringLiteral("%1 cannot be set").arg(tokens[i - 1]) : error);
                return 2;
            }
            if (!writeBound(target.control, *target.kind, value)) {
                err(QStringLiteral("%1 refused the value '%2'").arg(tokens[i - 1], value));
                return 2;
            }
        } else if (t == QLatin1String("get")) {
            if (!needArg(i, 1))
                return usage();
            const Target target = resolve(card.get(), tokens[++i], &error);
            if (!target.control) {
                err(error);
                return 2;
            }
            if (target.property == QLatin1String("Tag")) {
                out(target.control->property("Tag").toString());
            } else if (target.property == QLatin1String("ListCount")) {
                auto* combo = qobject_cast<QComboBox*>(target.control);
                out(QString::number(combo ? combo->count() : 0));
            } else {
                const auto value = target.kind ? readBound(target.control, *target.kind) : std::nullopt;
                if (!value) {
                    err(QStringLiteral("%1 has no such value").arg(tokens[i]));
                    return 2;
                }
                out(*value);
            }
        } else if (t == QLatin1String("click")) {
            if (!needArg(i, 1))
                return usage();
            QObject* c = card->control(tokens[++i]);
            if (!c) {
                err(QStringLiteral("no control named '%1'").arg(tokens[i]));
                return 2;
            }
            if (!clickControl(c)) {
                err(QStringLiteral("%1 cannot be clicked").arg(tokens[i]));
                return 2;
            }
        } else if (t == QLatin1String("call")) {
            if (!needArg(i, 1))
                return usage();
            const QString method = tokens[++i];
            const auto arity = methodArity(card.get(), method);
            if (!arity) {
                err(QStringLiteral("no public method named '%1'").arg(method));
                return 2;
            }
            QStringList args;
            // Required arguments are taken as they come; optional ones only up to the next verb.
            while (args.size() < arity->second && i + 1 < tokens.size()
                   && (args.size() < arity->first || (!kVerbs.contains(tokens[i + 1]) && !tokens[i + 1].startsWith(QLatin1String("--")))))
                args << tokens[++i];
            const CallResult r = callMethod(card.get(), method, args);
            if (!r.ok) {
                err(r.error);
                return 2;
            }
            if (r.hasValue)
                out(variantText(r.value));
        } else if (t == QLatin1String("additem")) {
            if (!needArg(i, 2))
                return usage();
            auto* combo = qobject_cast<QComboBox*>(card->control(tokens[i + 1]));
            if (!combo) {
                err(QStringLiteral("%1 is not a list").arg(tokens[i + 1]));
                return 2;
            }
            combo->addItem(tokens[i + 2]);
            i += 2;
        } else if (t == QLatin1String("grab")) {
            if (!needArg(i, 1))
                return usage();
            const QString file = tokens[++i];
            if (!card->grab().save(file)) {
                err(QStringLiteral("cannot write %1").arg(file));
                return 2;
            }
        }
        QCoreApplication::processEvents();
    }

    // Even without verbs the control is created and shown, so a host check sees it start.
    ensureCard();
    return prompt->criticalCount() > 0 ? 1 : 0;
}
