#include "NameLibrary.h"

#include "DataFolders.h"
#include "NameDatabases.h"

namespace {

NameDatabases& processDatabases()
{
    static NameDatabases databases;
    return databases;
}

} // namespace

void initializeLibrary()
{
    processDatabases().initialize(DataFolders::nameDatabaseFolder());
}

void loadNameDatabases()
{
    processDatabases().load(DataFolders::nameDatabaseFolder());
}

void lookupClass(const QString& idText, QString& name, QString& family, QString& subFamily)
{
    processDatabases().lookupClass(idText, name, family, subFamily);
}

void lookupClass(quint32 idNumber, QString& idText, QString& name, QString& family, QString& subFamily)
{
    processDatabases().lookupClass(idNumber, idText, name, family, subFamily);
}

void lookupInterface(const QString& idText, QString& name, QString& family, QString& subFamily)
{
    processDatabases().lookupInterface(idText, name, family, subFamily);
}

void lookupPriviledge(const QString& idText, PriviledgeRecord& record)
{
    processDatabases().lookupPriviledge(idText, record);
}

void lookupPriviledge(quint32 idNumber, PriviledgeRecord& record)
{
    processDatabases().lookupPriviledge(idNumber, record);
}

void priviledgesInRange(quint32 low, quint32 high, QList<PriviledgeRecord>& list)
{
    processDatabases().priviledgesInRange(low, high, list);
}
