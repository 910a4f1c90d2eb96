#include "ImageCopy.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>

#include <climits>
#include <unistd.h>

namespace {

// QFile::copy syncs every file to disk, which makes copying an image of thousands of files
// take seconds; a copy for one run of the simulator needs no such durability.
bool copyFile(const QString& from, const QString& to)
{
    QFile in(from);
    QFile out(to);
    if (!in.open(QIODevice::ReadOnly) || !out.open(QIODevice::WriteOnly | QIODevice::NewOnly))
        return false;
    QByteArray chunk;
    while (!(chunk = in.read(1024 * 1024)).isEmpty()) {
        if (out.write(chunk) != chunk.size())
            return false;
    }
    return in.error() == QFileDevice::NoError && out.setPermissions(in.permissions());
}

} // namespace

bool ImageCopy::copyTree(const QString& source, const QString& target, QString* error)
{
    if (!QDir().mkpath(target)) {
        *error = QStringLiteral("cannot create %1").arg(target);
        return false;
    }
    const QFileInfoList entries = QDir(source).entryInfoList(
        QDir::AllEntries | QDir::NoDotAndDotDot | QDir::Hidden | QDir::System);
    for (const QFileInfo& entry : entries) {
        const QString to = QDir(target).filePath(entry.fileName());
        if (entry.isSymLink()) {
            char link[PATH_MAX];
            const QByteArray from = QFile::encodeName(entry.filePath());
            const ssize_t length = ::readlink(from.constData(), link, sizeof link - 1);
            if (length < 0 || ::symlink(QByteArray(link, length).constData(), QFile::encodeName(to).constData()) != 0) {
                *error = QStringLiteral("cannot copy the link %1").arg(entry.filePath());
                return false;
            }
        } else if (entry.isDir()) {
            if (!copyTree(entry.filePath(), to, error))
                return false;
        } else if (entry.isFile()) {
            if (!copyFile(entry.filePath(), to)) {
                *error = QStringLiteral("cannot copy %1").arg(entry.filePath());
                return false;
            }
        }
    }
    return true;
}
