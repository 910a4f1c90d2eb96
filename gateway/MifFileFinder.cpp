#include "MifFileFinder.h"

#include <QDir>
#include <QDirIterator>
#include <QFile>
#include <QFileInfo>

#include <sys/stat.h>

#include <algorithm>
#include <functional>
#include <set>
#include <utility>

namespace {

using FolderKey = std::pair<dev_t, ino_t>;

// The folder a path leads to, links resolved; false when it cannot be examined.
bool folderKey(const QString& path, FolderKey& key)
{
    struct stat info;
    if (::stat(QFile::encodeName(path).constData(), &info) != 0 || !S_ISDIR(info.st_mode))
        return false;
    key = { info.st_dev, info.st_ino };
    return true;
}

bool hasMifSuffix(const QString& fileName)
{
    return fileName.endsWith(QLatin1String(".mif"), Qt::CaseInsensitive);
}

bool isRegularFile(const QString& path)
{
    struct stat info;
    return ::stat(QFile::encodeName(path).constData(), &info) == 0 && S_ISREG(info.st_mode);
}

} // namespace

QStringList MifFileFinder::find(const QString& directory)
{
    QStringList files;
    if (directory.isEmpty())
        return files; // QDir would take it for the working folder
    std::set<FolderKey> entered;
    // Subfolders are pushed in reverse name order so that they are entered in name order,
    // which makes the path that reaches a linked folder first the same on every run.
    QStringList pending { QDir(directory).path() };
    while (!pending.isEmpty()) {
        const QString folder = pending.takeLast();
        FolderKey key;
        if (!folderKey(folder, key) || !entered.insert(key).second)
            continue;
        // Regular files only, and links to them: Qt lets every link through the Files
        // filter, and a link to a FIFO or a device named *.mif would block or never end.
        QDirIterator children(folder, QDir::Dirs | QDir::Files | QDir::Hidden | QDir::NoDotAndDotDot);
        QStringList subfolders;
        while (children.hasNext()) {
            children.next();
            if (children.fileInfo().isDir())
                subfolders.append(children.filePath());
            else if (hasMifSuffix(children.fileName()) && isRegularFile(children.filePath()))
                files.append(children.filePath());
        }
        std::sort(subfolders.begin(), subfolders.end(), std::greater<QString>());
        pending.append(subfolders);
    }
    // Every path starts with the same folder path, so this orders by relative path.
    std::sort(files.begin(), files.end());
    return files;
}
