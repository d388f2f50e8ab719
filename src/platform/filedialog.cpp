#include "platform/filedialog.h"

#include <QFileDialog>

namespace tagora {

QStringList WidgetFileDialog::qtFilters(const QString& filter)
{
    QStringList out;
    const QStringList parts = filter.split(QLatin1Char('|'));
    for (int i = 0; i + 1 < parts.size(); i += 2) {
        QString patterns = parts[i + 1];
        patterns.replace(QLatin1Char(';'), QLatin1Char(' '));
        // The description usually repeats the patterns in brackets already.
        if (parts[i].contains(QLatin1Char('(')))
            out << parts[i];
        else
            out << parts[i] + QStringLiteral(" (") + patterns + QLatin1Char(')');
    }
    return out;
}

std::optional<QString> WidgetFileDialog::openFile(const FileRequest& request)
{
    QFileDialog dialog(m_parent, request.title, request.initialPath);
    dialog.setLayoutDirection(Qt::RightToLeft);
    dialog.setFileMode((request.flags & CommonDialog::CreatePrompt) ? QFileDialog::AnyFile : QFileDialog::ExistingFile);
    dialog.setAcceptMode(QFileDialog::AcceptOpen);
    const QStringList filters = qtFilters(request.filter);
    if (!filters.isEmpty()) {
        dialog.setNameFilters(filters);
        const int pos = request.filterIndex - 1;
        if (pos >= 0 && pos < filters.size())
            dialog.selectNameFilter(filters[pos]);
    }
    if (dialog.exec() != QDialog::Accepted || dialog.selectedFiles().isEmpty())
        return std::nullopt;
    return dialog.selectedFiles().constFirst();
}

std::optional<QString> ScriptedFileDialog::openFile(const FileRequest& request)
{
    m_asked.push_back(request);
    if (m_answers.empty())
        return std::nullopt;
    QString answer = m_answers.front();
    m_answers.pop_front();
    return answer;
}

CommonDialog::CommonDialog(QObject* parent)
    : QObject(parent)
{
}

bool CommonDialog::showOpen()
{
    if (!m_provider)
        return false;
    const auto chosen = m_provider->openFile({title, filter, filterIndex, flags, fileName});
    if (!chosen)
        return false;
    fileName = *chosen;
    return true;
}

} // namespace tagora
