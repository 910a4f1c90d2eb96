#pragma once

#include <QString>

// Copies a device image folder for --reset. Links are copied as links, never followed,
// so an image cannot pull files from outside itself into the copy.
class ImageCopy
{
public:
    static bool copyTree(const QString& source, const QString& target, QString* error);

    // The QTemporaryDir template of the copy this process serves, in folder: the name
    // carries the process id, so that a copy whose simulator died can be told apart.
    static QString copyTemplate(const QString& folder);
    // Removes, from folder, the copies (by the name copyTemplate gives) that belong to this
    // user and whose process is gone. Links and anything else are left alone. Returns how
    // many went.
    static int removeOrphanedCopies(const QString& folder);
};
