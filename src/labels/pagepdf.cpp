#include "labels/pagepdf.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QProcess>
#include <QStandardPaths>
#include <QTemporaryDir>
#include <QUrl>

#include <algorithm>

namespace tagora {

QString findHeadlessBrowser()
{
    for (const char* name : {"chromium", "chromium-browser", "google-chrome"}) {
        const QString path = QStandardPaths::findExecutable(QString::fromLatin1(name));
        if (!path.isEmpty())
            return path;
    }
    return {};
}

QString RenderPageToPdf(const QString& page, const QString& pdf, int timeoutSeconds, const QString& browser)
{
    const QString program = browser.isEmpty() ? findHeadlessBrowser() : browser;
    if (program.isEmpty())
        return QStringLiteral("הדפדפן Chromium אינו מותקן, ולכן לא ניתן להפיק את דף המדבקות כ-PDF");
    if (!QFileInfo(page).isFile())
        return QStringLiteral("דף המדבקות '%1' אינו קיים").arg(QDir::toNativeSeparators(page));
    // A profile of its own each time: no user's browser state, no lock held
    // by a browser the user has open.
    QTemporaryDir profile;
    if (!profile.isValid())
        return QStringLiteral("לא ניתן ליצור תיקייה זמנית לדפדפן");
    const QString aside = pdf + QStringLiteral(".part");
    QFile::remove(aside);
    QFile::remove(pdf);

    QProcess run;
    run.setProcessChannelMode(QProcess::MergedChannels);
    // Without the networking switches the browser tries to reach the network
    // at start, which a closed network makes wait.
    run.start(program, {QStringLiteral("--headless"), QStringLiteral("--no-sandbox"), QStringLiteral("--disable-gpu"),
                        QStringLiteral("--disable-quic"), QStringLiteral("--no-first-run"),
                        QStringLiteral("--disable-background-networking"), QStringLiteral("--disable-component-update"),
                        QStringLiteral("--disable-sync"), QStringLiteral("--user-data-dir=") + profile.path(),
                        QStringLiteral("--no-pdf-header-footer"), QStringLiteral("--print-to-pdf=") + aside,
                        QUrl::fromLocalFile(QFileInfo(page).absoluteFilePath()).toString()});
    if (!run.waitForStarted(30000))
        return QStringLiteral("לא ניתן להפעיל את הדפדפן '%1': %2").arg(program, run.errorString());
    const int ms = std::max(1, timeoutSeconds) * 1000;
    if (!run.waitForFinished(ms)) {
        run.kill();
        run.waitForFinished(5000);
        QFile::remove(aside);
        return QStringLiteral("הדפדפן לא סיים להפיק את דף המדבקות כ-PDF בתוך %1 שניות").arg(timeoutSeconds);
    }
    QFile made(aside);
    // The browser can end well and still write nothing (a page that calls
    // print on load): only a PDF counts.
    if (run.exitStatus() != QProcess::NormalExit || run.exitCode() != 0 || !made.open(QIODevice::ReadOnly)
        || made.read(5) != "%PDF-") {
        made.close();
        QFile::remove(aside);
        const QString tail = QString::fromLocal8Bit(run.readAll()).trimmed().right(300);
        return QStringLiteral("הדפדפן לא הפיק את דף המדבקות כ-PDF%1").arg(tail.isEmpty() ? QString() : QStringLiteral(": ") + tail);
    }
    made.close();
    if (!QFile::rename(aside, pdf)) {
        QFile::remove(aside);
        return QStringLiteral("לא ניתן לשמור את הקובץ '%1'").arg(QDir::toNativeSeparators(pdf));
    }
    return {};
}

} // namespace tagora
