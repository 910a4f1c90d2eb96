#include "PrivateTempFolder.h"

#include <QDir>
#include <QFile>

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>

namespace {

bool isPrivateFolder(const QByteArray& path)
{
    struct stat status {};
    return ::lstat(path.constData(), &status) == 0 && S_ISDIR(status.st_mode) && status.st_uid == ::geteuid()
        && (status.st_mode & 077) == 0;
}

} // namespace

QString privateTempFolder(const QString& base)
{
    const QString prefix = QDir::cleanPath(base) + QStringLiteral("/delvix-") + QString::number(::geteuid());
    const QByteArray usual = QFile::encodeName(prefix);
    if ((::mkdir(usual.constData(), 0700) == 0 || errno == EEXIST) && isPrivateFolder(usual))
        return prefix;
    QByteArray unique = QFile::encodeName(prefix + QStringLiteral("-XXXXXX"));
    if (!::mkdtemp(unique.data()))
        return QString();
    return QFile::decodeName(unique);
}
