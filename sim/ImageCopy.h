#pragma once

#include <QString>

// Copies a device image folder for --reset. Links are copied as links, never followed,
// so an image cannot pull files from outside itself into the copy.
class ImageCopy
{
public:
    static bool copyTree(const QString& source, const QString& target, QString* error);
};
