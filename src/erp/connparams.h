#pragma once

#include <QString>
#include <QVariant>

namespace tagora {

class SettingsStore;

// The ERP connection values, one set for the whole process, kept in the
// settings section "Params".
struct ConnParams {
    QString server = QStringLiteral("server"); // ODBC data source name
    QString uid = QStringLiteral("sa");
    QString pwd;
    QString database = QStringLiteral("demo"); // stored and edited, never sent
    short type = 1;                           // 1 visual Hebrew and dates, 2 logical text and minutes
    QString path = QStringLiteral("z:\\data\\demo"); // the company folder, for the item card
};

ConnParams& connParams();

inline const QString kParamsSection = QStringLiteral("Params");

// Reads the six values (defaults for missing keys). The type is stored as the
// position in the dialog's list, so a stored 1 is type 2.
void LoadConnParams(const SettingsStore& store);

// SQL dialect of the last connection text built: the date literal delimiter
// and the LIKE wildcard of its connection type.
struct ErpDialect {
    QString dateDelimiter = QStringLiteral("#");
    QString likeWildcard = QStringLiteral("*");
};
ErpDialect& erpDialect();

// "DSN=" + name + ";Uid=" + user + ";pwd=" + password for types 1 and 2 (and
// sets the dialect and the conversions' connection type); empty text for any
// other type, changing nothing. A value holding ";" or braces is quoted in
// braces as ODBC requires, so such a password still connects to a driver that
// reads braces; the SQLite driver reads none, and ErpConnection::open refuses
// such a value for it.
QString BuildConnString(const QString& server, const QString& uid, const QVariant& pwd, const QString& database,
                        short type);
// The connection text of the current values.
QString currentConnString();

} // namespace tagora
