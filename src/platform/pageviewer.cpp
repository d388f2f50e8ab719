#include "platform/pageviewer.h"

#include "platform/settingsstore.h"

#include <QDesktopServices>
#include <QFileInfo>
#include <QProcess>
#include <QUrl>

namespace tagora {

bool DesktopPageViewer::showPage(const QString& path, QString* error)
{
    const QUrl url = QUrl::fromLocalFile(QFileInfo(path).absoluteFilePath());
    const QString command = m_settings
        ? m_settings->value(kSettingsApp, QStringLiteral("Browser"), QStringLiteral("Command")).value_or(QString()).trimmed()
        : QString();
    if (!command.isEmpty()) {
        QStringList args = QProcess::splitCommand(command);
        if (args.isEmpty()) {
            *error = QStringLiteral("פקודת הדפדפן ריקה");
            return false;
        }
        bool placed = false;
        for (QString& a : args)
            if (a.contains(QLatin1String("%1"))) {
                a.replace(QLatin1String("%1"), url.toString());
                placed = true;
            }
        if (!placed)
            args << url.toString();
        const QString program = args.takeFirst();
        // Started on its own: the browser outlives the job and nothing waits for it.
        if (!QProcess::startDetached(program, args)) {
            *error = QStringLiteral("לא ניתן להפעיל את הדפדפן: %1").arg(program);
            return false;
        }
        return true;
    }
    if (!QDesktopServices::openUrl(url)) {
        *error = QStringLiteral("לא ניתן לפתוח את הדף בדפדפן: %1").arg(path);
        return false;
    }
    return true;
}

} // namespace tagora
