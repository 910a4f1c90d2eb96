#include "ImageCopy.h"

#include <QCoreApplication>
#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QRegularExpression>

#include <cerrno>
#include <climits>
#include <csignal>
#include <limits>
#include <sys/stat.h>
#include <unistd.h>

namespace {

const QString CopyPrefix = QStringLiteral("zantro-sim-image-");

bool processAlive(pid_t pid)
{
    return ::kill(pid, 0) == 0 || errno == EPERM;
}

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
            // A file nobody may read is left out, as a device serves the rest of its volume.
            if (!QFileInfo(entry.filePath()).isReadable()) {
                qWarning("%s is not readable: left out of the copy", qPrintable(entry.filePath()));
                continue;
            }
            if (!copyFile(entry.filePath(), to)) {
                *error = QStringLiteral("cannot copy %1").arg(entry.filePath());
                return false;
            }
        }
    }
    return true;
}

QString ImageCopy::copyTemplate(const QString& folder)
{
    return QDir(folder).filePath(CopyPrefix + QString::number(QCoreApplication::applicationPid()) + QStringLiteral("-XXXXXX"));
}

int ImageCopy::removeOrphanedCopies(const QString& folder)
{
    static const QRegularExpression name(QStringLiteral("^%1([1-9][0-9]{0,9})-[A-Za-z0-9]{6}$").arg(CopyPrefix));
    int removed = 0;
    const QStringList entries = QDir(folder).entryList(QDir::Dirs | QDir::NoDotAndDotDot | QDir::Hidden | QDir::NoSymLinks);
    for (const QString& entry : entries) {
        const QRegularExpressionMatch match = name.match(entry);
        const qlonglong pid = match.hasMatch() ? match.captured(1).toLongLong() : 0;
        if (pid <= 0 || pid > std::numeric_limits<pid_t>::max() || processAlive(pid_t(pid)))
            continue;
        // lstat: the entry itself, so a link put in its place since the listing is not followed.
        const QString path = QDir(folder).filePath(entry);
        struct stat info {};
        if (::lstat(QFile::encodeName(path).constData(), &info) != 0 || !S_ISDIR(info.st_mode) || info.st_uid != ::geteuid())
            continue;
        removed += QDir(path).removeRecursively() ? 1 : 0;
    }
    return removed;
}
