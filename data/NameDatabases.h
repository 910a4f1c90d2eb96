#pragma once

#include "IdRecord.h"
#include "PriviledgeRecord.h"

#include <QList>
#include <QMap>
#include <QString>

class QIODevice;

// The class, interface and privilege name databases ("ClassDB.xml", "InterfaceDB.xml",
// "PriviledgeDB.xml" in one folder). Lookups never fail: an unknown id yields "not found"
// and "unknown". Keys are the id texts exactly as the files write them.
class NameDatabases
{
public:
    // Reads the three files of the folder into the maps, each entry replacing an earlier one
    // with the same id. A missing, malformed or refused file leaves its database as it was.
    void load(const QString& directory);

    // load() on the first call only; later calls do nothing, whatever the folder.
    void initialize(const QString& directory);
    bool isInitialized() const { return m_initialized; }

    void lookupClass(const QString& idText, QString& name, QString& family, QString& subFamily) const;
    void lookupClass(quint32 idNumber, QString& idText, QString& name, QString& family, QString& subFamily) const;
    void lookupInterface(const QString& idText, QString& name, QString& family, QString& subFamily) const;
    void lookupPriviledge(const QString& idText, PriviledgeRecord& record) const;
    void lookupPriviledge(quint32 idNumber, PriviledgeRecord& record) const;

    // Privileges whose id, read as a number, lies in [low, high], in ascending id text order.
    void priviledgesInRange(quint32 low, quint32 high, QList<PriviledgeRecord>& list) const;

    // The entries of one database document read from an open device: direct children of
    // the root named elementName that have both an id and a name, in document order (only
    // the first four fields filled). Returns false, entries untouched and the reason in
    // error when given, if it breaks XmlReadPolicy's limits or does not parse.
    static bool readEntries(QIODevice* device, const QString& elementName, QList<IdRecord>& entries,
                            QString* error = nullptr);

private:
    static void lookupIn(const IdRecordMap& map, const QString& idText, QString& name, QString& family, QString& subFamily);
    // The entries of directory/fileName; none when it cannot be opened or parsed.
    static QList<IdRecord> readFile(const QString& directory, const QString& fileName, const QString& elementName);

    IdRecordMap m_classNames;
    IdRecordMap m_interfaceNames;
    QMap<QString, PriviledgeRecord> m_priviledgeNames;
    bool m_initialized = false;
};
