#include "platform/prompt.h"

#include <QMessageBox>

namespace tagora {

namespace {
QMessageBox::Icon boxIcon(PromptIcon icon)
{
    switch (icon) {
    case PromptIcon::Critical: return QMessageBox::Critical;
    case PromptIcon::Question: return QMessageBox::Question;
    case PromptIcon::Exclamation: return QMessageBox::Warning;
    case PromptIcon::Information: return QMessageBox::Information;
    case PromptIcon::None: break;
    }
    return QMessageBox::NoIcon;
}

void prepare(QMessageBox& box)
{
    box.setLayoutDirection(Qt::RightToLeft);
    box.setTextFormat(Qt::PlainText);
}
} // namespace

void MessageBoxPrompt::message(PromptIcon icon, const QString& title, const QString& text)
{
    QMessageBox box(boxIcon(icon), title, text, QMessageBox::Ok, m_parent);
    prepare(box);
    box.exec();
}

bool MessageBoxPrompt::ask(PromptIcon icon, const QString& title, const QString& text)
{
    QMessageBox box(boxIcon(icon), title, text, QMessageBox::Yes | QMessageBox::No, m_parent);
    prepare(box);
    box.setDefaultButton(QMessageBox::No);
    return box.exec() == QMessageBox::Yes;
}

void ScriptedPrompt::write(const QString& line)
{
    if (!m_out)
        return;
    const QByteArray bytes = line.toUtf8();
    std::fwrite(bytes.constData(), 1, size_t(bytes.size()), m_out);
    std::fputc('\n', m_out);
    std::fflush(m_out);
}

void ScriptedPrompt::message(PromptIcon icon, const QString& title, const QString& text)
{
    if (icon == PromptIcon::Critical)
        ++m_criticalCount;
    m_shown.push_back({icon, title, text, false, false});
    write(title + QStringLiteral(": ") + text);
}

bool ScriptedPrompt::ask(PromptIcon icon, const QString& title, const QString& text)
{
    bool answer = m_defaultAnswer;
    if (!m_answers.empty()) {
        answer = m_answers.front();
        m_answers.pop_front();
    }
    m_shown.push_back({icon, title, text, true, answer});
    write(title + QStringLiteral(": ") + text + (answer ? QStringLiteral(" -> yes") : QStringLiteral(" -> no")));
    return answer;
}

QStringList ScriptedPrompt::lines() const
{
    QStringList out;
    for (const Shown& s : m_shown)
        out << s.title + QStringLiteral(": ") + s.text;
    return out;
}

void ScriptedPrompt::clear()
{
    m_shown.clear();
    m_criticalCount = 0;
}

} // namespace tagora
