#pragma once

#include <QString>
#include <QStringList>

// Where the program's reference data (the name databases, the drag anchor, the Levels
// folder) are found. Every front end (the GUI, delvix-cli, zantro-sim) asks here.
namespace DataFolders {

// The folders looked in, in order: the executable's own folder (the build tree keeps the
// data beside the programs), ../share/delvix relative to it (an installed tree, wherever its
// prefix), then delvix/ in each XDG data folder (~/.local/share first).
QStringList searchPath();

// The path of the first entry called name (a file or a folder) in the search path; empty
// when no folder has one.
QString locate(const QString& name);

// The folder of the name databases: the first that holds ClassDB.xml, else the executable's
// own, where a missing database is then looked for.
QString nameDatabaseFolder();

// The level folders: the shipped one found through the search path (when there is one),
// then the user's own (~/.local/share/delvix/Levels), which need not exist.
QStringList levelFolders();

} // namespace DataFolders
