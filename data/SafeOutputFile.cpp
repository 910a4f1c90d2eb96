#include "SafeOutputFile.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <utility>

namespace {

QString systemError()
{
    return QString::fromLocal8Bit(std::strerror(errno));
}

} // namespace

SafeOutputFile::SafeOutputFile(const QString& path) : m_path(path) {}

SafeOutputFile::~SafeOutputFile()
{
    cancel();
}

QString SafeOutputFile::refusal() const
{
    struct stat info;
    if (::lstat(QFile::encodeName(m_path).constData(), &info) != 0)
        return errno == ENOENT ? QString() : systemError();
    if (S_ISLNK(info.st_mode))
        return QStringLiteral("it is a symbolic link, which is not written through");
    if (!S_ISREG(info.st_mode))
        return QStringLiteral("it is not a regular file");
    return QString();
}

bool SafeOutputFile::fail(const QString& message)
{
    m_error = message;
    cancel();
    return false;
}

bool SafeOutputFile::open()
{
    cancel();
    m_error.clear();
    if (const QString refused = refusal(); !refused.isEmpty())
        return fail(refused);
    const QFileInfo target(m_path);
    m_tempName = QFile::encodeName(QDir(target.absolutePath()).filePath(QStringLiteral(".%1.XXXXXX").arg(target.fileName())));
    // mkostemp creates with O_EXCL: a name planted meanwhile makes it pick another.
    m_fd = ::mkostemp(m_tempName.data(), O_CLOEXEC);
    if (m_fd < 0) {
        m_tempName.clear();
        return fail(systemError());
    }
    // A replaced file keeps its permissions; a new one gets the usual ones.
    struct stat info;
    mode_t mode = 0;
    if (::stat(QFile::encodeName(m_path).constData(), &info) == 0) {
        mode = info.st_mode & 07777;
    } else {
        const mode_t mask = ::umask(0);
        ::umask(mask);
        mode = 0666 & ~mask;
    }
    if (::fchmod(m_fd, mode) != 0)
        return fail(systemError());
    return true;
}

bool SafeOutputFile::write(const char* data, qint64 size)
{
    if (m_fd < 0)
        return false;
    while (size > 0) {
        const ssize_t written = ::write(m_fd, data, size_t(size));
        if (written < 0 && errno == EINTR)
            continue;
        if (written <= 0)
            return fail(systemError());
        data += written;
        size -= written;
    }
    return true;
}

bool SafeOutputFile::commit()
{
    if (m_fd < 0)
        return false;
    if (::fdatasync(m_fd) != 0 || ::close(std::exchange(m_fd, -1)) != 0)
        return fail(systemError());
    // Checked again: the target may have changed kind while the bytes were written.
    if (const QString refused = refusal(); !refused.isEmpty())
        return fail(refused);
    if (::rename(m_tempName.constData(), QFile::encodeName(m_path).constData()) != 0)
        return fail(systemError());
    m_tempName.clear();
    return true;
}

void SafeOutputFile::cancel()
{
    if (m_fd >= 0)
        ::close(std::exchange(m_fd, -1));
    if (!m_tempName.isEmpty())
        ::unlink(std::exchange(m_tempName, QByteArray()).constData());
}
