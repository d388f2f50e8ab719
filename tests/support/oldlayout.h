#pragma once

// Files as versions before caseless keys made them: the same tables, links
// and stored queries, with keys compared as stored.
#include "localdb/database.h"
#include "localdb/schema.h"

#include <QFile>

// Writes at oldPath a file laid out like the one at newPath, without its
// COLLATE NOCASE columns, then runs rowsSql in it.
inline tagora::DbError oldLayoutOf(const QString& newPath, const QString& oldPath, const QString& rowsSql = QString())
{
    using namespace tagora;
    QFile::remove(oldPath);
    Database db;
    if (DbError e = db.open(oldPath, Database::OpenMode::Create))
        return e;
    Statement attach = db.prepare(QStringLiteral("ATTACH DATABASE ?1 AS made"));
    attach.bind(1, newPath);
    if (DbError e = attach.run())
        return e;
    QStringList tables;
    {
        Statement s = db.prepare(QStringLiteral("SELECT name, sql FROM made.sqlite_master WHERE type = 'table'"
                                                " AND name NOT LIKE 'sqlite%' ORDER BY rowid"));
        while (s.step() == Statement::Step::Row) {
            QString sql = s.value(1).toString();
            if (s.value(0).toString() != kCatalogTable)
                sql.remove(QStringLiteral(" COLLATE NOCASE"));
            tables << sql;
        }
    }
    for (const QString& sql : tables)
        if (DbError e = db.exec(sql))
            return e;
    if (DbError e = db.exec(QStringLiteral("INSERT INTO main.%1 SELECT * FROM made.%1; DETACH DATABASE made").arg(kCatalogTable)))
        return e;
    db.close();
    if (rowsSql.isEmpty())
        return {};
    if (DbError e = db.open(oldPath))
        return e;
    return db.exec(rowsSql);
}

// An items database of an earlier version, upgraded as those were, holding rowsSql.
inline tagora::DbError makeOldItemsDb(const QString& path, const QString& rowsSql = QString())
{
    using namespace tagora;
    const QString made = path + QStringLiteral(".made");
    DbError e;
    if (CreateItemsDB(made, &e).isEmpty() || UpgradeAccountDef(made, &e).isEmpty())
        return e;
    e = oldLayoutOf(made, path, rowsSql);
    QFile::remove(made);
    return e;
}
