#pragma once

#include <QString>
#include <QStringList>

// Lists the MIF files of a platform build folder.
class MifFileFinder
{
public:
    // Every file below directory (at any depth) whose suffix is "mif" in any case, as the
    // directory's path joined with the file's relative path, ordered by relative path so that
    // the order never depends on the file system. Symlinked folders are followed, but no
    // folder is entered twice, so link loops end. Unreadable folders are passed over.
    static QStringList find(const QString& directory);
};
