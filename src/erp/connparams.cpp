#include "erp/connparams.h"

#include "erp/odbc.h"
#include "erp/textconv.h"
#include "platform/settingsstore.h"

namespace tagora {

ConnParams& connParams()
{
    static ConnParams params;
    return params;
}

ErpDialect& erpDialect()
{
    static ErpDialect dialect;
    return dialect;
}

void LoadConnParams(const SettingsStore& store)
{
    ConnParams& p = connParams();
    const ConnParams defaults;
    auto read = [&](const char* key, const QString& fallback) {
        return store.value(kSettingsApp, kParamsSection, QLatin1String(key)).value_or(fallback);
    };
    p.server = read("ConnServer", defaults.server);
    p.uid = read("ConnUID", defaults.uid);
    p.pwd = read("ConnPWD", defaults.pwd);
    p.database = read("ConnDataBase", defaults.database);
    bool ok = false;
    const int position = read("ConnType", QStringLiteral("0")).trimmed().toInt(&ok);
    p.type = short((ok ? position : 0) + 1);
    p.path = read("ConnPath", defaults.path);
    setErpConnType(p.type);
}

QString BuildConnString(const QString& server, const QString& uid, const QVariant& pwd, const QString& database,
                        short type)
{
    Q_UNUSED(database);
    if (type != 1 && type != 2)
        return QString();
    ErpDialect& d = erpDialect();
    d.dateDelimiter = type == 2 ? QStringLiteral("'") : QStringLiteral("#");
    d.likeWildcard = type == 2 ? QStringLiteral("%") : QStringLiteral("*");
    setErpConnType(type);
    const QString password = pwd.isValid() && !pwd.isNull() ? pwd.toString() : QString();
    return QStringLiteral("DSN=") + odbcConnValue(server) + QStringLiteral(";Uid=") + odbcConnValue(uid)
        + QStringLiteral(";pwd=") + odbcConnValue(password);
}

QString currentConnString()
{
    const ConnParams& p = connParams();
    return BuildConnString(p.server, p.uid, p.pwd, p.database, p.type);
}

} // namespace tagora
