#pragma once

#include "erp/itemimport.h"

#include <QString>
#include <QVector>
#include <vector>

namespace tagora {

// An ERP user as the user list offers it: the login in logical order, and
// the number the label lines are filed under.
struct ErpUser {
    QString login;
    int user = 0;
};

// The users with a number above 0 and a login. On a failure, what was read
// before it, with the driver's message in error.
QVector<ErpUser> ReadErpUsers(const QString& connString, QString* error);

// The ERP's label definitions into tPLabDef of the database at dbPath. A
// definition without a label file, or naming one this computer does not have,
// takes defaultLabel. Both readers write in one transaction: on a failure
// nothing of theirs is kept, and error holds the title and the ERP's message.
bool ReadLabelDefPriority(const ErpReadContext& ctx, const QString& dbPath, const QString& defaultLabel,
                          ReadError* error);
// One user's label lines into tPLabData, their parameters converted for the
// label. A parameter is kept whole whatever its length.
bool ReadLabelDataPriority(const ErpReadContext& ctx, const QString& dbPath, int user, ReadError* error);

// The queries the readers send; the user goes in as a value.
ErpQuery labelDataCountSql(int user);
ErpQuery labelDataSql(int user);

// The parameter number a row's variable caption names: 1 to 20, else 0.
int PlateVarNumber(const QString& caption);

// A row of the label field table as the label-list query reads it.
struct PlateFieldRow {
    bool sent = false;
    QString varCaption; // the row's variable number, as shown
    QString column;     // the record column the label program reads for the row
};

// The label-data query of a label list over the temporary documents database:
// copies, label file, the account key, and each sent row's parameter under
// the row's column. orderBy 1 ascending, 2 descending, else the engine's order.
QString PlateItemQuery(const QString& accountKey, const std::vector<PlateFieldRow>& rows, uchar orderBy);

} // namespace tagora
