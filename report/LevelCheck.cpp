#include "LevelCheck.h"

#include "DisplayText.h"
#include "LevelDefinition.h"

bool LevelCheck::check(const QString& path, const IdRecordMap& classes, QList<IdRecord>* entries, QString* error)
{
    LevelDefinition level;
    level.setIdMap(&classes);
    if (!level.load(path)) {
        *error = level.errorString();
        return false;
    }
    *entries = level.records();
    return true;
}

QStringList LevelCheck::cells(const IdRecord& entry)
{
    return {entry.name, entry.id, DisplayText::levelResult(entry.available)};
}
