#pragma once

#include <QString>

class QFile;

// Opens a file for reading only when it is a regular file, without waiting: a FIFO (which
// would block the open until a writer comes) or a device (which never ends), also behind
// a link, is refused at once. Shared by every reader of files someone else may have put
// in a folder we read: images, build folders.
class RegularFile
{
public:
    // file must not be open; on false error (may be null) says why.
    static bool open(QFile& file, const QString& path, QString* error = nullptr);
};
