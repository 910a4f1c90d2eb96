#pragma once

#include "IdRecord.h"

#include <QList>
#include <QString>

class QIODevice;

// One level definition file: the classes a device of that level must offer, as "Id"
// children (attributes "value" and "name") of the root element. With an id map set,
// each class takes its other fields from the map but keeps the file's name.
class LevelDefinition
{
public:
    // Not owned; may be null. Must outlive load().
    void setIdMap(const IdRecordMap* map) { m_idMap = map; }

    // Appends the file's classes. False, with the records unchanged and the reason in
    // errorString(), when the file cannot be opened, breaks XmlReadPolicy's limits or does
    // not parse; true otherwise, also when it lists no class.
    bool load(const QString& path);
    bool load(QIODevice* device); // open for reading
    QString errorString() const { return m_error; }

    void copyRecords(QList<IdRecord>& list) const { list = m_records; }
    const QList<IdRecord>& records() const { return m_records; }

private:
    QList<IdRecord> m_records;
    const IdRecordMap* m_idMap = nullptr;
    QString m_error;
};
