#pragma once

#include "PriviledgeRecord.h"

#include <QList>
#include <QString>

// The process-wide name databases, read from the folder DataFolders finds them in. Call
// initializeLibrary() on the GUI thread before the first lookup; the maps are read-only
// afterwards. (The icon resources live in the GUI, which registers them itself.)

// Loads the databases on the first call; later calls do nothing.
void initializeLibrary();

// Reads the three database files from that folder into the process-wide maps.
void loadNameDatabases();

void lookupClass(const QString& idText, QString& name, QString& family, QString& subFamily);
void lookupClass(quint32 idNumber, QString& idText, QString& name, QString& family, QString& subFamily);
void lookupInterface(const QString& idText, QString& name, QString& family, QString& subFamily);
void lookupPriviledge(const QString& idText, PriviledgeRecord& record);
void lookupPriviledge(quint32 idNumber, PriviledgeRecord& record);
void priviledgesInRange(quint32 low, quint32 high, QList<PriviledgeRecord>& list);
