#pragma once

#include "localdb/database.h"

#include <QDate>
#include <QString>

namespace tagora {

// A demonstration ERP company: the tables and rows the ERP readers expect, so
// the demo run, the tests and the benchmark have a database to read without
// the real ERP. The content is fixed by the options alone (a fixed
// pseudo-random sequence), so two runs with the same options give identical
// files.
struct DemoOptions {
    // PART rows of type 'R' or 'P' (at least 10; the oddities the readers must
    // cope with come first). A few items of other types are added on top.
    int items = 40;
    // 1: Hebrew text stored in visual order, dates stored as dates;
    // 2: logical text, dates as whole minutes since 1 January 1988.
    short connType = 2;
    // Document dates and the validity of special prices and product trees are
    // placed relative to this day.
    QDate today = QDate::currentDate();
    // USERS, LABELSDEF, LABELS. A server where USER is a reserved word cannot
    // hold them under the names the label-list readers use.
    bool labelLists = true;
};

// The picture the demo ERP names for one of its items, as the ERP writes it:
// from the ERP's folder, with its own separators.
inline const QString kDemoPictureName = QStringLiteral("..\\system\\mail\\pics\\OR-5.jpg");

// Creates the demo ERP as an SQLite file at path, replacing any file there.
// Rows are inserted as they are made, in one transaction, so memory stays the
// same whatever the number of items; on an error the file is removed.
DbError CreateDemoErp(const QString& path, const DemoOptions& options);

// The same tables and rows as a PostgreSQL script (DROP/CREATE TABLE, INSERT,
// CREATE INDEX in one transaction), loadable with `psql -v ON_ERROR_STOP=1 -f`.
// Identifiers are unquoted and upper-case, as in the SQLite file. The script
// is held whole, rows and text: meant for test-sized companies.
QString DemoErpScript(const DemoOptions& options);

} // namespace tagora
