#pragma once

#include "erp/democompany.h"

#include <QString>

namespace tagora {

class SettingsStore;

inline const QString kDemoDsn = QStringLiteral("TagoraDemo");

// Makes the demo company ready to use in one step: the demo ERP file in
// folder/erp, registered as the user's ODBC data source "TagoraDemo" through
// the SQLite ODBC driver, and the connection values and data folder
// (folder/data) written to the settings store. Empty text on success.
QString SetupDemoCompany(const QString& folder, const DemoOptions& options, SettingsStore& store);

// Registers (or re-points) a user data source at an SQLite file.
QString RegisterSqliteDsn(const QString& dsn, const QString& databasePath);

} // namespace tagora
