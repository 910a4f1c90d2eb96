#pragma once

#include <QString>
#include <QStringList>

// The level definition files: every regular file of the level folders (the shipped
// "Levels" and the user's own, see DataFolders) whose name contains ".xml" (case-sensitive,
// anywhere in the name), each folder's as the file system orders them. The list is cleared
// first; a missing folder adds nothing.
void listLevelFiles(QStringList& list);

// The same for one levels folder.
void listLevelFiles(const QString& levelsDirectory, QStringList& list);
