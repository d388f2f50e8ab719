#include "platform/platformdefaults.h"

#include <QDir>
#include <QStandardPaths>

namespace tagora {

QString platformDefault(const QString& text)
{
#ifdef Q_OS_WIN
    return text;
#else
    if (text.compare(QLatin1String("c:\\program files\\tagora"), Qt::CaseInsensitive) == 0)
        return QStandardPaths::writableLocation(QStandardPaths::GenericDataLocation) + QStringLiteral("/tagora");
    if (text.compare(QLatin1String("c:\\mylabel.lbl"), Qt::CaseInsensitive) == 0)
        return QDir::homePath() + QStringLiteral("/mylabel.lbl");
    return text;
#endif
}

QString joinDataPath(const QString& folder, const QString& fileName)
{
#ifdef Q_OS_WIN
    const QChar sep = QLatin1Char('\\');
#else
    const QChar sep = QLatin1Char('/');
#endif
    if (folder.endsWith(QLatin1Char('/')) || folder.endsWith(QLatin1Char('\\')))
        return folder + fileName;
    return folder + sep + fileName;
}

} // namespace tagora
