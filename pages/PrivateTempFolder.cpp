#include "PrivateTempFolder.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>

namespace {

bool isPrivateFolder(const QByteArray& path)
{
    struct stat status {};
    return ::lstat(path.constData(), &status) == 0 && S_ISDIR(status.st_mode) && status.st_uid == ::geteuid()
        && (status.st_mode & 077) == 0;
}

QString makeUnique(const QString& pattern)
{
    QByteArray unique = QFile::encodeName(pattern + QStringLiteral("-XXXXXX"));
    if (!::mkdtemp(unique.data()))
        return QString();
    return QFile::decodeName(unique);
}

} // namespace

PrivateTempFolder::PrivateTempFolder(const QString& base)
{
    const QString prefix = QDir::cleanPath(base) + QStringLiteral("/delvix-") + QString::number(::geteuid());
    const QByteArray usual = QFile::encodeName(prefix);
    if ((::mkdir(usual.constData(), 0700) == 0 || errno == EEXIST) && isPrivateFolder(usual)) {
        m_userFolder = prefix;
    } else {
        m_userFolder = makeUnique(prefix);
        m_removeUserFolder = !m_userFolder.isEmpty();
    }
    if (!m_userFolder.isEmpty())
        m_path = makeUnique(m_userFolder + QStringLiteral("/run"));
    if (m_path.isEmpty())
        m_error = QStringLiteral("no private folder can be made in %1: %2").arg(QDir::toNativeSeparators(base),
                                                                               QString::fromLocal8Bit(std::strerror(errno)));
}

PrivateTempFolder::~PrivateTempFolder()
{
    const QString made = m_removeUserFolder ? m_userFolder : m_path;
    if (!made.isEmpty())
        QDir(made).removeRecursively();
}

QString PrivateTempFolder::path() const
{
    return m_path;
}

QString PrivateTempFolder::error() const
{
    return m_error;
}

QString PrivateTempFolder::userFolder() const
{
    return m_userFolder;
}

const PrivateTempFolder& PrivateTempFolder::forProgram()
{
    // Destroyed at exit, which empties it.
    static std::unique_ptr<PrivateTempFolder> folder;
    // Also when something else removed it meanwhile.
    if (!folder || folder->path().isEmpty() || !QFileInfo(folder->path()).isDir())
        folder = std::make_unique<PrivateTempFolder>(QDir::tempPath());
    return *folder;
}
