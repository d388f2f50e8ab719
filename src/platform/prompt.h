#pragma once

#include <QString>
#include <QStringList>
#include <deque>
#include <cstdio>

class QWidget;

namespace tagora {

// Icons keep the message-box values the original screens used, so a caller
// can still say "critical" as 0x10 where that reads better.
enum class PromptIcon { None = 0, Critical = 0x10, Question = 0x20, Exclamation = 0x30, Information = 0x40 };

// Fixed titles of the system's message boxes.
namespace titles {
inline const QString Fault = QStringLiteral("תקלה");
inline const QString Error = QStringLiteral("שגיאה");
inline const QString Attention = QStringLiteral("שימו לב");
} // namespace titles

// Every message box and question of the system goes through this interface,
// so that data layers never show anything and every command can run without
// a screen (the headless host and the tests answer from a script).
class Prompt {
public:
    virtual ~Prompt() = default;
    virtual void message(PromptIcon icon, const QString& title, const QString& text) = 0;
    // A Yes/No question; true means Yes.
    virtual bool ask(PromptIcon icon, const QString& title, const QString& text) = 0;

    void critical(const QString& title, const QString& text) { message(PromptIcon::Critical, title, text); }
    void info(const QString& title, const QString& text) { message(PromptIcon::Information, title, text); }
};

// Message boxes on the screen, parented to the control so they stay on top of it.
class MessageBoxPrompt : public Prompt {
public:
    explicit MessageBoxPrompt(QWidget* parent = nullptr) : m_parent(parent) {}
    void message(PromptIcon icon, const QString& title, const QString& text) override;
    bool ask(PromptIcon icon, const QString& title, const QString& text) override;

private:
    QWidget* m_parent;
};

// Text prompt for the headless host and the tests: writes "TITLE: TEXT" lines to
// a stream (standard error by default, or nowhere), answers questions from a queue
// and then with a default answer, and remembers what it showed.
class ScriptedPrompt : public Prompt {
public:
    struct Shown {
        PromptIcon icon;
        QString title;
        QString text;
        bool question;
        bool answer;
    };

    explicit ScriptedPrompt(FILE* out = stderr) : m_out(out) {}

    void setDefaultAnswer(bool yes) { m_defaultAnswer = yes; }
    void queueAnswer(bool yes) { m_answers.push_back(yes); }

    void message(PromptIcon icon, const QString& title, const QString& text) override;
    bool ask(PromptIcon icon, const QString& title, const QString& text) override;

    const std::deque<Shown>& shown() const { return m_shown; }
    int criticalCount() const { return m_criticalCount; }
    // "TITLE: TEXT" of everything shown, in order.
    QStringList lines() const;
    void clear();

private:
    void write(const QString& line);

    FILE* m_out;
    bool m_defaultAnswer = false;
    std::deque<bool> m_answers;
    std::deque<Shown> m_shown;
    int m_criticalCount = 0;
};

} // namespace tagora
