#include "platform/pageviewer.h"

#include "platform/settingsstore.h"

#include <QDesktopServices>
#include <QDir>
#include <QFileInfo>
#include <QProcess>
#include <QSaveFile>
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

bool PageViewer::navigate(const QString& from, const QString& to, QString* error)
{
    // Written aside and renamed over the waiting page, so its next reload
    // reads either the waiting page or the whole redirect, never a part.
    const QString target = QUrl::fromLocalFile(QFileInfo(to).absoluteFilePath()).toString(QUrl::FullyEncoded);
    QSaveFile page(from);
    if (page.open(QIODevice::WriteOnly)) {
        page.write(QByteArrayLiteral("<HTML>\r\n<HEAD>\r\n<meta http-equiv='refresh' content='0;url=")
                   + target.toLatin1().replace('\'', "%27")
                   + QByteArrayLiteral("'>\r\n</HEAD>\r\n<BODY>\r\n</BODY>\r\n</HTML>\r\n"));
        if (page.commit())
            return true;
    }
    *error = QStringLiteral("לא ניתן להעביר את חלון הדפדפן לדף %1").arg(QDir::toNativeSeparators(to));
    return false;
}

bool ShowPageAfterWaitPage(PageViewer& pages, const QString& waitPage, const std::function<QString()>& writePage,
                           QString* error)
{
    if (!pages.showPage(waitPage, error))
        return false;
    const QString page = writePage();
    return page.isEmpty() || pages.navigate(waitPage, page, error);
}

} // namespace tagora
