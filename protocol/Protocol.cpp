#include "Protocol.h"

#include <QDir>
#include <QFileInfo>
#include <QStandardPaths>

#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

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
    { Operation::CopyToPCChunk, "CopyToPCChunk" },
    { Operation::CopyToPCEnd, "CopyToPCEnd" },
    { Operation::CopyToDeviceBegin, "CopyToDeviceBegin" },
    { Operation::UploadChunk, "UploadChunk" },
    { Operation::CopyToDeviceCommit, "CopyToDeviceCommit" },
    { Operation::UploadAbort, "UploadAbort" },
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

bool ensureSocketDirectory(const QString& directory, QString* error)
{
    const QByteArray path = QFile::encodeName(directory);
    if (!QDir().mkpath(directory)) {
        *error = QStringLiteral("Cannot create the socket folder %1").arg(directory);
        return false;
    }
    struct stat info;
    if (::lstat(path.constData(), &info) != 0 || !S_ISDIR(info.st_mode)) {
        *error = QStringLiteral("The socket folder %1 is not a plain folder").arg(directory);
        return false;
    }
    if (info.st_uid != ::geteuid()) {
        *error = QStringLiteral("The socket folder %1 belongs to another user").arg(directory);
        return false;
    }
    if ((info.st_mode & 07777) != 0700 && ::chmod(path.constData(), 0700) != 0) {
        *error = QStringLiteral("Cannot restrict the socket folder %1 to its owner").arg(directory);
        return false;
    }
    return true;
}

void widenSocketBuffers(qintptr descriptor)
{
    const int bytes = int(4 * TransferChunkSize);
    ::setsockopt(int(descriptor), SOL_SOCKET, SO_SNDBUF, &bytes, sizeof bytes);
    ::setsockopt(int(descriptor), SOL_SOCKET, SO_RCVBUF, &bytes, sizeof bytes);
}

} // namespace Protocol
