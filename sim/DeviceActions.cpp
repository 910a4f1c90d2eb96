#include "DeviceActions.h"

#include "DeviceState.h"
#include "PackageInstaller.h"
#include "PortlexErrors.h"
#include "RegularFile.h"

#include <QDir>
#include <QFileInfo>

#include <algorithm>
#include <chrono>
#include <cstdio>

namespace {

qint32 codeFor(VolumePathResolver::Status status)
{
    return status == VolumePathResolver::Status::NotFound || status == VolumePathResolver::Status::NoVolume
        ? qint32(PortlexError::NotFound)
        : qint32(PortlexError::PathRefused);
}

// Installation answers carry a status text whatever the result, and so do refusals that
// the path alone does not explain.
Answer statusFailure(qint32 code, const QString& statusText)
{
    QByteArray body;
    PayloadStream out(&body);
    out << statusText;
    return Answer::failure(code, body);
}

qint64 monotonicMs()
{
    return std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::steady_clock::now().time_since_epoch()).count();
}

QString readOnlyText(const QString& devicePath)
{
    return QStringLiteral("%1 refused: system module folders are read-only").arg(devicePath);
}

bool isDirectory(const QString& localPath)
{
    const QFileInfo info(localPath);
    return info.isDir() && !info.isSymLink();
}

} // namespace

DeviceActions::DeviceActions(DeviceState& state)
    : m_state(state), m_clock(monotonicMs)
{
}

bool DeviceActions::isAction(Operation operation)
{
    return quint32(operation) >= quint32(Operation::CopyToPCBegin) && quint32(operation) <= quint32(Operation::DeleteDeviceFile);
}

Answer DeviceActions::handle(const Request& request)
{
    // Transfers gone quiet end first, so that the room they reserved counts as free.
    m_now = m_clock();
    m_transfers.discardIdle(m_now - TransferIdleLimitMs);
    switch (request.operation) {
    case Operation::CopyToPCBegin:
        return copyToPCBegin(request);
    case Operation::CopyToPCStream:
        return openStream(request, TransferTable::Kind::Download);
    case Operation::CopyToPCEnd:
        return endTransfer(request, TransferTable::Kind::Download);
    case Operation::CopyToDeviceBegin:
        return copyToDeviceBegin(request);
    case Operation::UploadStream:
        return openStream(request, TransferTable::Kind::Upload);
    case Operation::CopyToDeviceCommit:
        return copyToDeviceCommit(request);
    case Operation::InstallPackageBegin:
        return installBegin(request);
    case Operation::InstallPackageCommit:
        return installCommit(request);
    case Operation::RunApplication:
        return run(request);
    case Operation::DeleteDeviceFile:
        return remove(request);
    default:
        return Answer::failure(PortlexError::UnknownOperation);
    }
}

quint64 DeviceActions::roomLeft(int volume)
{
    const quint64 free = m_state.freeSpace(volume);
    const quint64 promised = m_transfers.reservedBytes(volume);
    return promised >= free ? 0 : free - promised;
}

void DeviceActions::sweepLeftovers()
{
    int removed = 0;
    for (int volume = 0; volume < m_state.resolver().mountCount(); ++volume) {
        // An install a kill cut short is rolled back before its staging folder goes.
        removed += PackageInstaller::recover(m_state.resolver().rootFolder(volume));
        removed += TransferTable::sweep(m_state.resolver().rootFolder(volume));
    }
    if (removed > 0)
        m_state.filesChanged();
}

Answer DeviceActions::copyToPCBegin(const Request& request)
{
    PayloadStream in(request.payload);
    QString path;
    in >> path;
    if (!in.ok())
        return Answer::failure(PortlexError::BadRequest);
    VolumePathResolver::Target target;
    const VolumePathResolver::Status status = m_state.resolver().resolveExisting(path, target);
    if (status != VolumePathResolver::Status::Ok)
        return Answer::failure(codeFor(status));
    if (QFileInfo(target.localPath).isDir())
        return Answer::failure(PortlexError::IsDirectory);
    if (m_transfers.full(request.connectionId))
        return Answer::failure(PortlexError::Refused);
    TransferTable::Transfer transfer;
    transfer.connectionId = request.connectionId;
    transfer.kind = TransferTable::Kind::Download;
    // Regular files only: opening a FIFO would block the whole device.
    transfer.file = std::make_unique<QFile>();
    if (!RegularFile::open(*transfer.file, target.localPath))
        return Answer::failure(PortlexError::IoError);
    transfer.size = quint64(transfer.file->size());
    transfer.volume = target.volume;
    transfer.lastActive = m_now;
    const quint64 size = transfer.size;
    return Answer::success(m_transfers.add(std::move(transfer)), size);
}

TransferTable::Transfer* DeviceActions::streamed(quint64 connectionId, quint32 id, TransferTable::Kind kind)
{
    TransferTable::Transfer* transfer = m_transfers.find(id, connectionId, kind);
    // Either kind of upload takes its bytes the same way.
    if (!transfer && kind == TransferTable::Kind::Upload)
        transfer = m_transfers.find(id, connectionId, TransferTable::Kind::Package);
    if (transfer)
        transfer->lastActive = m_now = m_clock();
    return transfer;
}

Answer DeviceActions::openStream(const Request& request, TransferTable::Kind kind)
{
    PayloadStream in(request.payload);
    quint32 id = 0;
    quint64 size = 0;
    in >> id;
    if (kind == TransferTable::Kind::Upload)
        in >> size;
    if (!in.ok())
        return Answer::failure(PortlexError::BadRequest);
    TransferTable::Transfer* transfer = streamed(request.connectionId, id, kind);
    if (!transfer)
        return Answer::failure(PortlexError::NotFound);
    if (kind == TransferTable::Kind::Upload && size != transfer->size - transfer->done) {
        m_transfers.discard(id);
        return Answer::failure(PortlexError::TransferIncomplete);
    }
    return Answer();
}

qint64 DeviceActions::readStream(quint64 connectionId, quint32 id, char* data, qint64 max)
{
    TransferTable::Transfer* transfer = streamed(connectionId, id, TransferTable::Kind::Download);
    if (!transfer)
        return -qint64(PortlexError::NotFound);
    const qint64 got = transfer->file->read(data, max);
    if (got < 0) {
        m_transfers.discard(id);
        return -qint64(PortlexError::IoError);
    }
    transfer->done += quint64(got);
    return got;
}

qint32 DeviceActions::writeStream(quint64 connectionId, quint32 id, const char* data, qint64 size)
{
    TransferTable::Transfer* transfer = streamed(connectionId, id, TransferTable::Kind::Upload);
    if (!transfer)
        return PortlexError::NotFound;
    qint32 result = 0;
    if (size == 0)
        result = PortlexError::Cancelled;
    else if (quint64(size) > transfer->size - transfer->done)
        result = PortlexError::TransferIncomplete;
    else if (transfer->file->write(data, size) != size)
        result = PortlexError::IoError;
    if (result != 0) {
        m_transfers.discard(id);
        return result;
    }
    transfer->done += quint64(size);
    return 0;
}

Answer DeviceActions::endTransfer(const Request& request, TransferTable::Kind kind)
{
    PayloadStream in(request.payload);
    quint32 id = 0;
    in >> id;
    if (!in.ok())
        return Answer::failure(PortlexError::BadRequest);
    if (!m_transfers.find(id, request.connectionId, kind))
        return Answer::failure(PortlexError::NotFound);
    m_transfers.discard(id);
    return Answer();
}

Answer DeviceActions::copyToDeviceBegin(const Request& request)
{
    PayloadStream in(request.payload);
    QString path;
    quint64 size = 0;
    in >> path >> size;
    if (!in.ok())
        return Answer::failure(PortlexError::BadRequest);
    VolumePathResolver::Target target;
    QString staging;
    VolumePathResolver::Status status = m_state.resolver().resolveForCreate(path, target);
    if (status == VolumePathResolver::Status::NotFound)
        status = resolveInNewFolders(path, target, staging);
    if (status != VolumePathResolver::Status::Ok)
        return Answer::failure(codeFor(status));
    if (TransferTable::hasReservedName(target.devicePath))
        return statusFailure(PortlexError::PathRefused,
                             QStringLiteral("%1 refused: names starting with %2 or %3 are kept for the device's temporary files")
                                 .arg(target.devicePath, TransferTable::PartialPrefix, TransferTable::StagingPrefix));
    if (m_state.touchesSystemFolder(target.localPath))
        return statusFailure(PortlexError::PathRefused, readOnlyText(target.devicePath));
    if (isDirectory(target.localPath))
        return Answer::failure(PortlexError::IsDirectory);
    // A file that is replaced gives its room back.
    const QFileInfo existing(target.localPath);
    const quint64 replaced = existing.isFile() && !existing.isSymLink() ? quint64(existing.size()) : 0;
    if (size > roomLeft(target.volume) + replaced)
        return Answer::failure(PortlexError::NoSpace);
    if (m_transfers.full(request.connectionId))
        return Answer::failure(PortlexError::Refused);

    TransferTable::Transfer transfer;
    transfer.connectionId = request.connectionId;
    transfer.kind = TransferTable::Kind::Upload;
    transfer.file = TransferTable::createPartial(staging.isEmpty() ? QFileInfo(target.localPath).path() : staging);
    if (!transfer.file)
        return Answer::failure(PortlexError::IoError);
    transfer.targetPath = target.localPath;
    transfer.volume = target.volume;
    transfer.size = size;
    transfer.lastActive = m_now;
    return Answer::success(m_transfers.add(std::move(transfer)));
}

VolumePathResolver::Status DeviceActions::resolveInNewFolders(const QString& devicePath, VolumePathResolver::Target& target,
                                                             QString& staging) const
{
    QStringList missing;
    QString existing = devicePath;
    while (existing != QLatin1String("/")) {
        const qsizetype slash = existing.lastIndexOf(QLatin1Char('/'));
        if (slash < 0)
            break;
        missing.prepend(existing.mid(slash + 1));
        existing = slash == 0 ? QStringLiteral("/") : existing.left(slash);
        VolumePathResolver::Target folder;
        const VolumePathResolver::Status status = m_state.resolver().resolveExisting(existing, folder);
        if (status == VolumePathResolver::Status::NotFound)
            continue;
        if (status != VolumePathResolver::Status::Ok)
            return status;
        if (!isDirectory(folder.localPath))
            return VolumePathResolver::Status::NotFound;
        target.volume = folder.volume;
        target.devicePath = devicePath;
        target.localPath = folder.localPath + QLatin1Char('/') + missing.join(QLatin1Char('/'));
        staging = folder.localPath;
        return VolumePathResolver::Status::Ok;
    }
    return VolumePathResolver::Status::NotFound;
}

Answer DeviceActions::copyToDeviceCommit(const Request& request)
{
    PayloadStream in(request.payload);
    quint32 id = 0;
    in >> id;
    if (!in.ok())
        return Answer::failure(PortlexError::BadRequest);
    TransferTable::Transfer* transfer = m_transfers.find(id, request.connectionId, TransferTable::Kind::Upload);
    if (!transfer)
        return Answer::failure(PortlexError::NotFound);
    if (transfer->done != transfer->size) {
        m_transfers.discard(id);
        return Answer::failure(PortlexError::TransferIncomplete);
    }
    transfer->file->close();
    const bool written = transfer->file->error() == QFileDevice::NoError
        && QDir().mkpath(QFileInfo(transfer->targetPath).path());
    // rename() replaces the target in one step; a link in its place is replaced, not followed.
    if (!written
        || std::rename(QFile::encodeName(transfer->file->fileName()).constData(),
                       QFile::encodeName(transfer->targetPath).constData()) != 0) {
        m_transfers.discard(id);
        m_state.filesChanged();
        return Answer::failure(PortlexError::IoError);
    }
    m_transfers.take(id);
    m_state.filesChanged();
    return Answer();
}

Answer DeviceActions::installBegin(const Request& request)
{
    PayloadStream in(request.payload);
    quint16 volumeId = 0;
    QString name;
    quint64 size = 0;
    in >> volumeId >> name >> size;
    if (!in.ok())
        return statusFailure(PortlexError::BadRequest, QStringLiteral("The install request could not be read"));

    const QList<VolumeSpec>& volumes = m_state.profile().volumes;
    const auto volume = std::find_if(volumes.cbegin(), volumes.cend(),
                                     [volumeId](const VolumeSpec& v) { return quint16(v.id) == volumeId; });
    if (volume == volumes.cend())
        return statusFailure(PortlexError::NotFound, QStringLiteral("Package %1 refused: there is no volume %2").arg(name).arg(volumeId));
    const QString installPath = VolumePathResolver::joinDevicePath(volume->mountPoint, volume->installFolder);
    VolumePathResolver::Target target;
    if (m_state.resolver().resolveExisting(installPath, target) != VolumePathResolver::Status::Ok
        || !isDirectory(target.localPath))
        return statusFailure(PortlexError::NotFound, QStringLiteral("Package %1 refused: the volume has no install folder").arg(name));
    const quint64 room = roomLeft(target.volume);
    if (size > room)
        return statusFailure(PortlexError::NoSpace,
                             QStringLiteral("Package %1 refused: it takes %2 bytes and the volume has %3 bytes free")
                                 .arg(name).arg(size).arg(room));
    if (m_transfers.full(request.connectionId))
        return statusFailure(PortlexError::Refused, QStringLiteral("Package %1 refused: too many transfers are open").arg(name));

    TransferTable::Transfer transfer;
    transfer.connectionId = request.connectionId;
    transfer.kind = TransferTable::Kind::Package;
    transfer.file = TransferTable::createPartial(target.localPath);
    if (!transfer.file)
        return statusFailure(PortlexError::IoError, QStringLiteral("Package %1 refused: the install folder cannot be written").arg(name));
    transfer.targetPath = target.localPath;
    transfer.name = name;
    transfer.volume = target.volume;
    transfer.size = size;
    transfer.lastActive = m_now;
    return Answer::success(m_transfers.add(std::move(transfer)), QStringLiteral("Receiving package %1").arg(name));
}

Answer DeviceActions::installCommit(const Request& request)
{
    PayloadStream in(request.payload);
    quint32 id = 0;
    in >> id;
    if (!in.ok())
        return statusFailure(PortlexError::BadRequest, QStringLiteral("The install request could not be read"));
    if (!m_transfers.find(id, request.connectionId, TransferTable::Kind::Package))
        return statusFailure(PortlexError::NotFound, QStringLiteral("No package is being received"));
    TransferTable::Transfer transfer = m_transfers.take(id);
    transfer.file->close();
    if (transfer.done != transfer.size || transfer.file->error() != QFileDevice::NoError) {
        transfer.file->remove();
        return statusFailure(PortlexError::TransferIncomplete, QStringLiteral("Package %1 arrived incomplete").arg(transfer.name));
    }
    PackageInstaller::Rules rules;
    rules.spaceLimit = roomLeft(transfer.volume);
    rules.refuse = [this](const QString& relativePath) { return refusedEntry(relativePath); };
    rules.keepAlive = request.keepAlive;
    QString status;
    const bool installed = PackageInstaller::install(transfer.file->fileName(), transfer.name, transfer.targetPath, rules, &status);
    transfer.file->remove();
    m_state.filesChanged();
    return installed ? Answer::success(status) : statusFailure(PortlexError::Refused, status);
}

// A package may not bring a module that shadows a system module of the same name.
QString DeviceActions::refusedEntry(const QString& relativePath) const
{
    const QFileInfo entry(relativePath);
    if (entry.suffix().compare(QLatin1String("mif"), Qt::CaseInsensitive) == 0 && m_state.isSystemModule(entry.completeBaseName()))
        return QStringLiteral("the entry \"%1\" would replace the system module %2").arg(relativePath, entry.completeBaseName());
    return QString();
}

Answer DeviceActions::run(const Request& request)
{
    PayloadStream in(request.payload);
    QString path;
    in >> path;
    if (!in.ok())
        return Answer::failure(PortlexError::BadRequest);
    VolumePathResolver::Target target;
    const VolumePathResolver::Status status = m_state.resolver().resolveExisting(path, target);
    if (status != VolumePathResolver::Status::Ok)
        return Answer::failure(codeFor(status));
    const QFileInfo module(target.localPath);
    if (!module.isFile() || module.suffix().compare(QLatin1String("mod"), Qt::CaseInsensitive) != 0)
        return Answer::failure(PortlexError::NotRunnable);

    const QString name = QFileInfo(target.devicePath).completeBaseName();
    ProcessSpec spec;
    spec.name = name;
    spec.threads = { { name + QStringLiteral("::Main"), 100, 1 }, { name + QStringLiteral("::UI"), 90, 2 },
                     { name + QStringLiteral("::Timer"), 80, 2 } };
    spec.modules = { { QFileInfo(target.devicePath).fileName(), target.devicePath, quint32(module.size()), false },
                     { QStringLiteral("zcore.lib"), QStringLiteral("/sys/lib/zcore.lib"), 412160, false },
                     { QStringLiteral("zui.lib"), QStringLiteral("/sys/lib/zui.lib"), 258048, false } };
    m_state.startProcess(spec, m_runLifetimeMs);
    return Answer();
}

Answer DeviceActions::remove(const Request& request)
{
    PayloadStream in(request.payload);
    QString path;
    in >> path;
    if (!in.ok())
        return Answer::failure(PortlexError::BadRequest);
    VolumePathResolver::Target target;
    const VolumePathResolver::Status status = m_state.resolver().resolveEntry(path, target);
    if (status != VolumePathResolver::Status::Ok)
        return Answer::failure(codeFor(status));
    const QFileInfo entry(target.localPath);
    if (!entry.exists() && !entry.isSymLink())
        return Answer::failure(PortlexError::NotFound);
    if (m_state.touchesSystemFolder(target.localPath))
        return statusFailure(PortlexError::PathRefused, readOnlyText(target.devicePath));
    // removeRecursively never follows links: a link inside is removed, not what it names.
    const bool removed = isDirectory(target.localPath) ? QDir(target.localPath).removeRecursively()
                                                       : QFile::remove(target.localPath);
    m_state.filesChanged();
    return removed ? Answer() : Answer::failure(PortlexError::IoError);
}
