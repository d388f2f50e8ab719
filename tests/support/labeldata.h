#pragma once

// A data folder holding a few items, accounts and documents, the way the
// imports leave them, for the label query and the label runs.
#include "localdb/database.h"
#include "localdb/schema.h"

#include <QTemporaryDir>

struct LabelData {
    QTemporaryDir dir;
    QString folder = dir.filePath(QStringLiteral("data"));
    QString docs = folder + QStringLiteral("/") + tagora::dbfiles::TempDocs;

    explicit LabelData(const QString& extraSql = QString())
    {
        tagora::DbError e = tagora::PrepareDataFolder(folder);
        if (!e)
            tagora::CreateTempDocsDB(folder + QStringLiteral("/") + tagora::dbfiles::Config,
                                     folder + QStringLiteral("/") + tagora::dbfiles::Items, docs, &e);
        if (!e)
            e = exec(QStringLiteral(
                "INSERT INTO tItems (ItemKey, ItemName, ItemSort, BarCode, Unit, Price, Coin, Copies, PrintLabel) VALUES"
                " ('A1', 'Bolt', '10', '7290000000015', 'pc', 5, 'ILS', 2, 1),"
                " ('A2', 'Nut', '10', '72900000000280', 'pc', 1.5, 'ILS', 1, 1),"
                " ('B1', 'Washer', '20', NULL, 'pc', 0.25, 'ILS', 3, 1),"
                " ('C9', 'Unmarked', '20', '1', 'pc', 9, 'ILS', 1, 0);"
                "INSERT INTO tAlterKeys VALUES ('O''Brien', 'A1', 'OB-A1', 'OBBAR1');"
                "INSERT INTO tAlterPrices VALUES ('O''Brien', 'A1', 4.5, 'ILS');"
                "INSERT INTO tPriceList VALUES ('A1', 3, 4.75, 'ILS'), ('A2', 3, 1.25, 'ILS');"
                "INSERT INTO tAccountDef (AccountKey, PriceList, LabelName, Include) VALUES ('O''Brien', 3, '', 1);"
                "INSERT INTO tAgents VALUES (7, 'Dana');"
                "INSERT INTO tTempDocHeaders (WizFileID, Number, DocType, Reference1, AccountKey, Include, CardName, PackRem) VALUES"
                " (2, 100, 1, 'SO100', 'O''Brien', 1, 'O''Brien Ltd', 'fragile'),"
                " (2, 101, 1, 'SO101', 'C2', 1, 'Second', NULL),"
                " (2, 102, 1, 'SO102', 'C3', 0, 'Not included', NULL);"
                "INSERT INTO tTempDocLines (WizFileID, HeadNumber, LineNum, ItemKey, ItemName, Quantity, Copies, Include, AgentID, AlterNum) VALUES"
                " (2, 100, 1, 'A1', 'Bolt line', 4, 4, 1, 7, 'L-A1'),"
                " (2, 100, 2, 'A2', 'Nut line', 1, 1, 1, NULL, NULL),"
                " (2, 101, 1, 'B1', 'Washer line', 2, 2, 1, NULL, NULL),"
                " (2, 101, 2, 'A1', 'Skipped line', 9, 9, 0, NULL, NULL),"
                " (2, 102, 1, 'A1', 'Excluded doc', 1, 1, 1, NULL, NULL);")
                     + extraSql);
        if (e)
            qFatal("label data: %s", qPrintable(e.message));
    }

    tagora::DbError exec(const QString& sql) const
    {
        tagora::Database db;
        if (tagora::DbError e = db.open(docs))
            return e;
        return db.exec(sql);
    }
};
