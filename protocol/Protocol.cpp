#include "Protocol.h"

#include <QDir>
#include <QFileInfo>
#include <QStandardPaths>

#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

namespace {

struct OperationName
{
    Operation operation;
    const char* name;
};

const OperationName operationNames[] = {
    { Operation::Hello, "Hello" },
    { Operation::Connect, "Connect" },
    { Operation::GetCache, "GetCache" },
    { Operation::GetModules, "GetModules" },
    { Operation::GetModuleMif, "GetModuleMif" },
    { Operation::GetLoadedModules, "GetLoadedModules" },
    { Operation::GetProcesses, "GetProcesses" },
    { Operation::GetVolumes, "GetVolumes" },
    { Operation::GetRegistry, "GetRegistry" },
    { Operation::GetChildSettings, "GetChildSettings" },
    { Operation::GetFileSystemLevel, "GetFileSystemLevel" },
    { Operation::GetTepSigPrivs, "GetTepSigPrivs" },
    { Operation::TepStatus, "TepStatus" },
    { Operation::GlobalTestSigStatus, "GlobalTestSigStatus" },
    { Operation::CopyToPCBegin, "CopyToPCBegin" },
    { Operation::CopyToPCStream, "CopyToPCStream" },
    { Operation::CopyToPCEnd, "CopyToPCEnd" },
    { Operation::CopyToDeviceBegin, "CopyToDeviceBegin" },
    { Operation::UploadStream, "UploadStream" },
    { Operation::CopyToDeviceCommit, "CopyToDeviceCommit" },
    { Operation::InstallPackageBegin, "InstallPackageBegin" },
    { Operation::InstallPackageCommit, "InstallPackageCommit" },
    { Operation::RunApplication, "RunApplication" },
    { Operation::DeleteDeviceFile, "DeleteDeviceFile" },
};

} // namespace

namespace Protocol {

bool isKnownOperation(quint32 value)
{
    for (const auto& entry : operationNames) {
        if (static_cast<quint32>(entry.operation) == value)
            return true;
    }
    return false;
}

QString operationName(Operation operation)
{
    for (const auto& entry : operationNames) {
        if (entry.operation == operation)
            return QString::fromLatin1(entry.name);
    }
    return QString();
}

QString socketDirectory()
{
    const QString overridden = qEnvironmentVariable("ZANTRO_SIM_DIR");
    if (!overridden.isEmpty())
        return QDir::cleanPath(overridden);
    return QStandardPaths::writableLocation(QStandardPaths::RuntimeLocation) + QStringLiteral("/zantro-sim");
}

bool checkSocketDirectory(const QString& directory, QString* error)
{
    struct stat info;
    if (::lstat(QFile::encodeName(directory).constData(), &info) != 0) {
        *error = QStringLiteral("The socket folder %1 cannot be used: %2").arg(directory, qt_error_string(errno));
        return false;
    }
    if (!S_ISDIR(info.st_mode)) {
        *error = QStringLiteral("The socket folder %1 is not a plain folder (a link or a file)").arg(directory);
        return false;
    }
    if (info.st_uid != ::geteuid()) {
        *error = QStringLiteral("The socket folder %1 belongs to another user").arg(directory);
        return false;
    }
    // Anyone who may write there could swap a device's socket for their own.
    if ((info.st_mode & (S_IWGRP | S_IWOTH)) != 0) {
        *error = QStringLiteral("The socket folder %1 can be written by other users (mode %2); use a private folder")
                     .arg(directory)
                     .arg(info.st_mode & 07777, 4, 8, QLatin1Char('0'));
        return false;
    }
    return true;
}

bool ensureSocketDirectory(const QString& directory, QString* error)
{
    const QByteArray path = QFile::encodeName(directory);
    struct stat info;
    if (::lstat(path.constData(), &info) != 0 && errno == ENOENT) {
        // Only a folder we create ourselves gets our mode; an existing one keeps its own.
        const bool parent = QDir().mkpath(QFileInfo(directory).absolutePath());
        if (!parent || (::mkdir(path.constData(), 0700) != 0 && errno != EEXIST)) {
            *error = QStringLiteral("Cannot create the socket folder %1: %2").arg(directory, qt_error_string(errno));
            return false;
        }
    }
    return checkSocketDirectory(directory, error);
}

void widenSocketBuffers(qintptr descriptor)
{
    const int bytes = int(4 * TransferChunkSize);
    ::setsockopt(int(descriptor), SOL_SOCKET, SO_SNDBUF, &bytes, sizeof bytes);
    ::setsockopt(int(descriptor), SOL_SOCKET, SO_RCVBUF, &bytes, sizeof bytes);
}

} // namespace Protocol
