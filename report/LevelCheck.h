#pragma once

#include "IdRecord.h"

#include <QList>
#include <QString>
#include <QStringList>

// A device's classes checked against a level definition: each class the level requires,
// with the device's record of it, found or not.
class LevelCheck
{
public:
    // The level's classes as the device has them; false, with the reason in *error, when
    // the file cannot be read or is no level definition.
    static bool check(const QString& path, const IdRecordMap& classes, QList<IdRecord>* entries, QString* error);

    // Name, id and result, in FamilyReport's class columns.
    static QStringList cells(const IdRecord& entry);
};
