#pragma once

// A data folder whose documents database reaches `items` marked items, for
// the label benchmarks. `insertSql` fills tItems (it sees the count as %1).
#include "localdb/database.h"
#include "localdb/schema.h"

#include <QTemporaryDir>
#include <cstdio>

inline QString benchDataFolder(const QTemporaryDir& dir, int items, const QString& insertSql)
{
    const QString folder = dir.filePath(QStringLiteral("data"));
    const QString docs = folder + QStringLiteral("/") + tagora::dbfiles::TempDocs;
    tagora::DbError e = tagora::PrepareDataFolder(folder);
    if (!e)
        tagora::CreateTempDocsDB(folder + "/" + tagora::dbfiles::Config, folder + "/" + tagora::dbfiles::Items, docs, &e);
    if (!e) {
        tagora::Database db;
        e = db.open(docs);
        if (!e)
            e = db.exec(QStringLiteral("WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < %1) ")
                            .arg(items)
                        + insertSql);
    }
    if (e) {
        std::fprintf(stderr, "data: %s\n", qPrintable(e.message));
        return QString();
    }
    return docs;
}
