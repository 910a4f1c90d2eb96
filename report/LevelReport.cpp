#include "LevelReport.h"

#include "LevelDefinition.h"

bool LevelReport::check(const QString& path, const IdRecordMap& classes, QList<IdRecord>* entries, QString* error)
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

QString LevelReport::resultText(const IdRecord& entry)
{
    return entry.available ? QStringLiteral("Found") : QStringLiteral("Not Found");
}

QStringList LevelReport::cells(const IdRecord& entry)
{
    return {entry.name, entry.id, resultText(entry)};
}
