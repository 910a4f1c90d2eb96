#pragma once

#include <QString>
#include <QVector>

// One directory's entries with what a level needs of them, read with a single lstat per
// entry (and one stat more for a link). Far cheaper than QFileInfo for folders of
// thousands of files.
class DirectoryListing
{
public:
    struct Entry
    {
        QString name;
        bool directory = false;
        bool link = false;   // the entry itself is a symbolic link (and what follows is its target's)
        bool readable = false;
        bool writable = false;
        quint64 size = 0;
    };

    // Entries in name order, without "." and "..", devices, sockets, pipes and dangling
    // links. False when the folder cannot be read.
    static bool list(const QString& folder, QVector<Entry>& entries);
};
