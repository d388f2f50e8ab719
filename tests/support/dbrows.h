#pragma once

// Whole result sets as text lines, for comparing tables in tests.
#include "localdb/database.h"

#include <QStringList>

inline QStringList rows(const QString& dbPath, const QString& sql, const QVariantList& values = {})
{
    tagora::Database db;
    if (db.open(dbPath))
        return {QStringLiteral("<cannot open>")};
    QStringList out;
    tagora::Statement s = db.prepare(sql);
    for (int i = 0; i < values.size(); ++i)
        s.bind(i + 1, values[i]);
    while (s.step() == tagora::Statement::Step::Row) {
        QStringList cells;
        for (int i = 0; i < s.columnCount(); ++i)
            cells << (s.value(i).isValid() ? s.value(i).toString() : QStringLiteral("<null>"));
        out << cells.join(QLatin1Char('|'));
    }
    return out;
}

inline QVariant scalar(const QString& dbPath, const QString& sql)
{
    tagora::Database db;
    db.open(dbPath);
    return db.scalar(sql);
}

// Runs sql on an existing file, to set up or change its rows.
inline tagora::DbError execOn(const QString& dbPath, const QString& sql)
{
    tagora::Database db;
    if (tagora::DbError e = db.open(dbPath))
        return e;
    return db.exec(sql);
}
