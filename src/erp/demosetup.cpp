#include "erp/demosetup.h"

#include "erp/connparams.h"
#include "localdb/database.h"
#include "platform/settingsstore.h"

#include <QBuffer>
#include <QDir>
#include <QFileInfo>
#include <QImage>
#include <QPainter>
#include <QSaveFile>

#include <vector>

#include <odbcinst.h>

namespace tagora {

namespace {
const char* kSqliteDriver = "SQLite3";

// The demo item's picture where the ERP's name for it leads from the ERP's
// folder, so the item card has a picture to show: a hexagon-headed screw,
// drawn without text (no fonts needed without a screen). Empty text on success.
QString writeDemoPicture(const QString& erpFolder)
{
    const QString path =
        QDir::cleanPath(QDir(erpFolder).filePath(QString(kDemoPictureName).replace(QLatin1Char('\\'), QLatin1Char('/'))));
    const QString failed = QStringLiteral("לא ניתן לכתוב את התמונה '%1'").arg(QDir::toNativeSeparators(path));
    if (!QDir().mkpath(QFileInfo(path).absolutePath()))
        return failed;
    QImage image(160, 120, QImage::Format_RGB32);
    image.fill(QColor(0xF4, 0xF8, 0xFB));
    {
        QPainter p(&image);
        p.setRenderHint(QPainter::Antialiasing);
        p.setPen(QPen(QColor(0x40, 0x48, 0x50), 2));
        p.setBrush(QColor(0xB8, 0xC0, 0xC8));
        const QPolygonF head{{20, 60}, {32, 38}, {56, 38}, {68, 60}, {56, 82}, {32, 82}};
        p.drawPolygon(head);
        p.drawRect(QRectF(68, 50, 74, 20));
        for (int x = 76; x < 142; x += 8)
            p.drawLine(QPointF(x, 50), QPointF(x + 5, 70));
    }
    // Without the JPEG plugin the picture goes as PNG under the same name:
    // browsers go by the content, not by the name.
    QByteArray bytes;
    for (const char* format : {"JPG", "PNG"}) {
        bytes.clear();
        QBuffer buffer(&bytes);
        if (buffer.open(QIODevice::WriteOnly) && image.save(&buffer, format, 90))
            break;
        bytes.clear();
    }
    QSaveFile out(path);
    if (bytes.isEmpty() || !out.open(QIODevice::WriteOnly) || out.write(bytes) != bytes.size())
        return failed;
    return out.commit() ? QString() : failed;
}
} // namespace

QString RegisterSqliteDsn(const QString& dsn, const QString& databasePath)
{
    SQLSetConfigMode(ODBC_USER_DSN);
    const QByteArray name = dsn.toUtf8();
    const QByteArray path = QFileInfo(databasePath).absoluteFilePath().toUtf8();
    bool ok = SQLWriteDSNToIni(name.constData(), kSqliteDriver)
        && SQLWritePrivateProfileString(name.constData(), "Database", path.constData(), "odbc.ini")
        // Waits briefly rather than failing when another reader holds the file.
        && SQLWritePrivateProfileString(name.constData(), "Timeout", "5000", "odbc.ini");
    SQLSetConfigMode(ODBC_BOTH_DSN);
    if (ok)
        return QString();
    DWORD code = 0;
    char message[512] = {};
    WORD len = 0;
    SQLInstallerError(1, &code, message, sizeof(message) - 1, &len);
    return QStringLiteral("לא ניתן לרשום את מקור הנתונים %1: %2").arg(dsn, QString::fromUtf8(message, len));
}

QString SetupDemoCompany(const QString& folder, const DemoOptions& options, SettingsStore& store)
{
    const QDir root(folder);
    if (!QDir().mkpath(root.filePath(QStringLiteral("erp"))) || !QDir().mkpath(root.filePath(QStringLiteral("data"))))
        return QStringLiteral("לא ניתן ליצור את התיקייה '%1'").arg(QDir::toNativeSeparators(folder));
    const QString erpFile = QFileInfo(root.filePath(QStringLiteral("erp/demo.sqlite"))).absoluteFilePath();
    if (const DbError e = CreateDemoErp(erpFile, options))
        return e.message;
    if (const QString e = RegisterSqliteDsn(kDemoDsn, erpFile); !e.isEmpty())
        return e;
    if (const QString e = writeDemoPicture(QFileInfo(erpFile).absolutePath()); !e.isEmpty())
        return e;

    const std::pair<const char*, QString> params[] = {
        {"ConnServer", kDemoDsn},
        {"ConnUID", QStringLiteral("sa")},
        {"ConnPWD", QString()},
        {"ConnDataBase", QStringLiteral("demo")},
        {"ConnType", QString::number(options.connType == 2 ? 1 : 0)},
        {"ConnPath", QFileInfo(erpFile).absolutePath()},
    };
    for (const auto& [key, value] : params)
        store.setValue(kSettingsApp, kParamsSection, QLatin1String(key), value);
    // A direct label to start from: name, barcode, price.
    const std::pair<const char*, std::vector<std::pair<const char*, const char*>>> layout[] = {
        {"LabelDef0", {{"UseCell", "-1"}, {"FldID", "1"}, {"ViewType", "0"}, {"FontSize", "10"}, {"FontWeight", "2"}}},
        {"LabelDef1", {{"UseCell", "-1"}, {"FldID", "4"}, {"ViewType", "1"}}},
        {"LabelDef2", {{"UseCell", "-1"}, {"FldID", "6"}, {"ViewType", "0"}, {"Prefix", "מחיר:"}}},
        {"LabelBar", {{"BarType", "2"}, {"DimX", "0.01"}, {"BarHeight", "0.4"}, {"UserResoX", "0"}, {"UserResoY", "0"}, {"ShowDesc", "-1"}}},
        {"DirectLabel", {{"PageRows", "6"}, {"PageCols", "3"}}},
    };
    for (const auto& [section, keys] : layout)
        for (const auto& [key, value] : keys)
            if (!store.value(kSettingsApp, QLatin1String(section), QLatin1String(key)))
                store.setValue(kSettingsApp, QLatin1String(section), QLatin1String(key), QString::fromUtf8(value));
    store.setValue(kSettingsApp, QStringLiteral("GeneralParams"), QStringLiteral("DBPath"),
                   QFileInfo(root.filePath(QStringLiteral("data"))).absoluteFilePath());
    if (!store.flush())
        return QStringLiteral("לא ניתן לכתוב את ההגדרות");
    return QString();
}

} // namespace tagora
