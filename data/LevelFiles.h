#pragma once

#include <QString>
#include <QStringList>

// The level definition files: every regular file of the "Levels" folder beside the program
// whose name contains ".xml" (case-sensitive, anywhere in the name), as the file system
// orders them. The list is cleared first; a missing folder gives an empty list.
void listLevelFiles(QStringList& list);

// The same for another levels folder.
void listLevelFiles(const QString& levelsDirectory, QStringList& list);
