#include "_ZantDevice.h"

#include "DeviceConnection.h"
#include "PayloadStream.h"
#include "PortlexErrors.h"
#include "RecordStreams.h"
#include "ThreadConnections.h"
#include "TransferProgress.h"

#include "SafeOutputFile.h"

#include <QFileInfo>
#include <QMutexLocker>

namespace {

template <typename... Values>
QByteArray pack(const Values&... values)
{
    QByteArray bytes;
    PayloadStream out(&bytes);
    ((out << values), ...);
    return bytes;
}

template <typename T>
void readField(QDataStream& in, QVector<T>& list)
{
    readList(in, list);
}

template <typename T>
void readField(QDataStream& in, T& value)
{
    in >> value;
}

// Failures after which the device may not have seen the request.
bool transportFailure(int result)
{
    return result == PortlexError::Timeout || result == PortlexError::Unreachable || result == PortlexError::ProtocolError
        || result == PortlexError::VersionMismatch || result == PortlexError::Untrusted;
}

// Walks of the device's trees (settings, folders) follow the paths the device names; a
// child that is not one plain name below its parent, or deeper than any device goes,
// would let a broken device send them round in circles or down for ever.
constexpr int MaxTreeDepth = 128;

bool isChildPath(const QString& parent, const QString& child)
{
    const qsizetype start = parent.size() + (parent.endsWith(QLatin1Char('/')) ? 0 : 1);
    if (!child.startsWith(parent) || child.size() <= start || (start > parent.size() && child.at(parent.size()) != QLatin1Char('/')))
        return false;
    const QStringView name = QStringView(child).mid(start);
    return !name.contains(QLatin1Char('/')) && name != u"." && name != u".." && child.count(QLatin1Char('/')) <= MaxTreeDepth;
}

template <typename Children>
int checkChildren(const QString& parent, const Children& children, QString* reason)
{
    for (const auto& child : children) {
        if (!isChildPath(parent, child->Path())) {
            if (reason)
                *reason = QStringLiteral("The device named %1 as a child of %2").arg(child->Path(), parent);
            return PortlexError::ProtocolError;
        }
    }
    return 0;
}

} // namespace

_ZantDevice::_ZantDevice(const QString& displayName, const QString& socketPath)
    : name(displayName), m_socketPath(socketPath), m_lifetime(std::make_shared<int>(0))
{
}

_ZantDevice::~_ZantDevice() = default;

QString _ZantDevice::socketPath() const
{
    QMutexLocker lock(&m_mutex);
    return m_socketPath;
}

void _ZantDevice::setSocketPath(const QString& socketPath)
{
    QMutexLocker lock(&m_mutex);
    m_socketPath = socketPath;
}

QSharedPointer<const DeviceCache> _ZantDevice::cache() const
{
    QMutexLocker lock(&m_mutex);
    return m_cache ? m_cache : QSharedPointer<const DeviceCache>::create();
}

int _ZantDevice::call(Operation operation, const QByteArray& request, QByteArray* body, QString* reason)
{
    if (reason)
        reason->clear();
    const bool attaching = operation == Operation::Connect || operation == Operation::GetCache;
    if (!attaching && !m_connected) {
        if (reason)
            *reason = QStringLiteral("The device is not connected");
        return PortlexError::NotConnected;
    }
    const bool service = serviceLockRequest.exchange(false);
    const bool signature = signatureLockRequest.exchange(false);
    Protocol::RequestFlags flags;
    flags.setFlag(Protocol::ServiceLockRequest, service);
    flags.setFlag(Protocol::SignatureLockRequest, signature);

    DeviceConnection& connection = ThreadConnections::forDevice(m_lifetime, socketPath());
    {
        QMutexLocker lock(&m_mutex);
        connection.setConnectRequest(operation == Operation::Connect ? QByteArray() : m_connectRequest);
    }
    const int result = connection.call(operation, request, flags, body, QDeadlineTimer(DeviceConnection::callTimeoutMs()));
    if (transportFailure(result)) {
        // Keep the requests for the next call, which reaches the device again.
        if (service)
            serviceLockRequest = true;
        if (signature)
            signatureLockRequest = true;
        if (reason)
            *reason = connection.errorString();
    } else if (result != 0 && reason && body && !body->isEmpty()) {
        // A refusal that says why: that is the device's word for the user.
        PayloadStream in(*body);
        QString said;
        in >> said;
        if (in.ok())
            *reason = said;
    }
    return result;
}

template <typename... Fields>
int _ZantDevice::query(Operation operation, const QByteArray& request, QString* reason, Fields&... fields)
{
    QByteArray body;
    const int result = call(operation, request, &body, reason);
    if (result != 0)
        return result;
    PayloadStream in(body);
    (readField(in, fields), ...);
    return in.ok() ? 0 : int(PortlexError::ProtocolError);
}

bool _ZantDevice::attach(const QString& user, const QString& password, int* code, QString* reason)
{
    QByteArray body;
    const QByteArray connect = pack(user, password);
    *code = call(Operation::Connect, connect, &body, reason);
    if (transportFailure(*code))
        return false;
    // The device's word on the connection comes whatever the result.
    PayloadStream in(body);
    in >> *reason;
    if (*code != 0)
        return false;
    {
        QMutexLocker lock(&m_mutex);
        m_connectRequest = connect;
    }
    auto filled = QSharedPointer<DeviceCache>::create();
    QString why;
    *code = query(Operation::GetCache, QByteArray(), &why, *filled);
    if (*code != 0) {
        *reason = QStringLiteral("The device did not give its description");
        if (!why.isEmpty())
            *reason += QStringLiteral(": ") + why;
        return false;
    }
    {
        QMutexLocker lock(&m_mutex);
        m_cache = filled;
    }
    m_connected = true;
    return true;
}

int _ZantDevice::GetModules(QVector<ModuleInfo>& modules, PortlexProgressCallback, void*, QString* reason)
{
    // The answer arrives as one frame: there are no steps to report.
    QVector<ModuleInfo> answer;
    const int result = query(Operation::GetModules, QByteArray(), reason, answer);
    if (result == 0)
        modules = std::move(answer);
    return result;
}

int _ZantDevice::GetModuleMif(const QString& modulePath, MifEntry& entry, QString* reason)
{
    MifEntry answer;
    const int result = query(Operation::GetModuleMif, pack(modulePath), reason, answer);
    if (result == 0)
        entry = std::move(answer);
    return result;
}

int _ZantDevice::GetLoadedModules(QVector<LoadedModuleInfo>& processes, QString* reason)
{
    QVector<LoadedModuleInfo> answer;
    const int result = query(Operation::GetLoadedModules, QByteArray(), reason, answer);
    if (result == 0)
        processes = std::move(answer);
    return result;
}

int _ZantDevice::GetProcesses(QVector<ProcessInfo>& processes, QString* reason)
{
    QVector<ProcessInfo> answer;
    const int result = query(Operation::GetProcesses, QByteArray(), reason, answer);
    if (result == 0)
        processes = std::move(answer);
    return result;
}

int _ZantDevice::GetVolumes(QSet<VolumeInfo>& volumes, QString* reason)
{
    QVector<VolumeInfo> answer;
    const int result = query(Operation::GetVolumes, QByteArray(), reason, answer);
    if (result == 0)
        volumes = QSet<VolumeInfo>(answer.cbegin(), answer.cend());
    return result;
}

int _ZantDevice::GetRegistry(QVector<RegistryInfo>& entries, PortlexProgressCallback, void*, QString* reason)
{
    QVector<RegistryInfo> answer;
    const int result = query(Operation::GetRegistry, QByteArray(), reason, answer);
    if (result == 0)
        entries = std::move(answer);
    return result;
}

int _ZantDevice::GetChildSettings(QSharedPointer<_SettingsInfo>& node, QString* reason)
{
    if (!node)
        return PortlexError::InvalidArgument;
    _SettingsInfo answer;
    int result = query(Operation::GetChildSettings, pack(node->Path()), reason, answer);
    if (result == 0)
        result = checkChildren(node->Path(), answer.children, reason);
    if (result == 0)
        *node = std::move(answer);
    return result;
}

int _ZantDevice::GetFileSystemLevel(const QString& path, QSharedPointer<_DirectoryInfo>& level, PortlexProgressCallback,
                                    void*, QString* reason)
{
    _DirectoryInfo answer;
    int result = query(Operation::GetFileSystemLevel, pack(path), reason, answer);
    if (result == 0)
        result = checkChildren(answer.Path(), answer.directories, reason);
    if (result == 0) {
        if (!level)
            level = QSharedPointer<_DirectoryInfo>::create();
        *level = std::move(answer);
    }
    return result;
}

int _ZantDevice::GetTepSigPrivs(QVector<PriviledgeRecord>& privileges, QString* reason)
{
    QVector<PriviledgeRecord> answer;
    const int result = query(Operation::GetTepSigPrivs, QByteArray(), reason, answer);
    if (result == 0)
        privileges = std::move(answer);
    return result;
}

EnablementStatus _ZantDevice::TepStatus(QString& mode, QString& owner, QString& expiry, QString* reason)
{
    return enablement(Operation::TepStatus, mode, owner, expiry, reason);
}

EnablementStatus _ZantDevice::GlobalTestSigStatus(QString& mode, QString& owner, QString& expiry, QString* reason)
{
    return enablement(Operation::GlobalTestSigStatus, mode, owner, expiry, reason);
}

EnablementStatus _ZantDevice::enablement(Operation operation, QString& mode, QString& owner, QString& expiry,
                                         QString* reason)
{
    qint32 status = EnablementDisabled;
    QString answerMode, answerOwner, answerExpiry;
    const int result = query(operation, QByteArray(), reason, status, answerMode, answerOwner, answerExpiry);
    if (result != 0)
        return EnablementStatus(result);
    mode = answerMode;
    owner = answerOwner;
    expiry = answerExpiry;
    return EnablementStatus(status);
}

int _ZantDevice::upload(Operation operation, quint32 transferId, QFile& source, quint64 size,
                        PortlexProgressCallback callback, void* context, QString* reason)
{
    const TransferProgress progress(callback, context, size);
    DeviceConnection& connection = ThreadConnections::forDevice(m_lifetime, socketPath());
    const int result = connection.upload(
        operation, pack(transferId, size), source.handle(), size,
        [&progress](quint64 sent) { return progress.cancelled(sent) ? qint32(PortlexError::Cancelled) : 0; },
        QDeadlineTimer(DeviceConnection::callTimeoutMs()));
    if (result != 0 && reason)
        *reason = connection.errorString();
    return result;
}

int _ZantDevice::CopyFileToPC(const QString& devicePath, const QString& localPath, PortlexProgressCallback callback,
                              void* context, QString* reason)
{
    quint32 transferId = 0;
    quint64 size = 0;
    int result = query(Operation::CopyToPCBegin, pack(devicePath), reason, transferId, size);
    if (result != 0)
        return result;
    SafeOutputFile sink(localPath);
    const TransferProgress progress(callback, context, size);
    QString localError;
    if (!sink.open()) {
        result = PortlexError::LocalFileError;
        localError = sink.errorString();
    }
    const bool started = result == 0;
    bool streamed = false;
    if (started) {
        DeviceConnection& connection = ThreadConnections::forDevice(m_lifetime, socketPath());
        quint64 received = 0;
        result = connection.download(
            Operation::CopyToPCStream, pack(transferId),
            [&](const char* data, qint64 length) -> qint32 {
                if (quint64(length) > size - received)
                    return PortlexError::ProtocolError;
                if (!sink.write(data, length))
                    return PortlexError::LocalFileError;
                received += quint64(length);
                return progress.cancelled(received) ? qint32(PortlexError::Cancelled) : 0;
            },
            QDeadlineTimer(DeviceConnection::callTimeoutMs()));
        streamed = result == 0;
        if (result == PortlexError::LocalFileError)
            localError = sink.errorString();
        else if (result != 0)
            localError = connection.errorString();
        // The file shrank on the device while it was sent.
        if (streamed && received != size)
            result = PortlexError::TransferIncomplete;
    }
    // A stream that failed took the transfer with it (the device ended it, or the dropped
    // connection did); otherwise it is still open.
    if (streamed || !started) {
        QByteArray body;
        const int ended = call(Operation::CopyToPCEnd, pack(transferId), &body, result == 0 ? reason : nullptr);
        if (result == 0)
            result = ended;
    }
    if (result == 0 && !sink.commit()) {
        result = PortlexError::LocalFileError;
        localError = sink.errorString();
    }
    if (result != 0 && reason && !localError.isEmpty())
        *reason = result == PortlexError::LocalFileError ? QStringLiteral("%1: %2").arg(localPath, localError) : localError;
    return result;
}

int _ZantDevice::CopyFileToDevice(const QString& localPath, const QString& devicePath, PortlexProgressCallback callback,
                                  void* context, QString* reason)
{
    QFile source(localPath);
    if (!QFileInfo(localPath).isFile() || !source.open(QIODevice::ReadOnly)) {
        if (reason)
            *reason = QStringLiteral("%1 is not a readable file").arg(localPath);
        return PortlexError::LocalFileError;
    }
    // One size read: what is announced is what is sent, however the file changes meanwhile.
    const quint64 size = quint64(source.size());
    quint32 transferId = 0;
    int result = query(Operation::CopyToDeviceBegin, pack(devicePath, size), reason, transferId);
    if (result != 0)
        return result;
    result = upload(Operation::UploadStream, transferId, source, size, callback, context, reason);
    if (result != 0)
        return result;
    QByteArray body;
    return call(Operation::CopyToDeviceCommit, pack(transferId), &body, reason);
}

int _ZantDevice::InstallPackage(const QString& localPath, unsigned short volumeId, QString* reason)
{
    QFile package(localPath);
    if (!QFileInfo(localPath).isFile() || !package.open(QIODevice::ReadOnly)) {
        if (reason)
            *reason = QStringLiteral("Cannot read the package %1").arg(localPath);
        return PortlexError::LocalFileError;
    }
    const QString name = QFileInfo(localPath).fileName();
    const quint64 size = quint64(package.size());
    QByteArray body;
    int result = call(Operation::InstallPackageBegin, pack(volumeId, name, size), &body, nullptr);
    QString status;
    quint32 transferId = 0;
    PayloadStream begun(body);
    if (result == 0)
        begun >> transferId;
    begun >> status;
    if (result == 0 && begun.ok())
        result = upload(Operation::UploadStream, transferId, package, size, nullptr, nullptr, &status);
    if (result == 0) {
        result = call(Operation::InstallPackageCommit, pack(transferId), &body, nullptr);
        PayloadStream committed(body);
        committed >> status;
    }
    if (status.isEmpty())
        status = result == 0 ? QStringLiteral("%1 installed").arg(name)
                             : QStringLiteral("The package %1 was not installed").arg(name);
    if (reason)
        *reason = status;
    return result;
}

int _ZantDevice::RunApplication(const QString& devicePath, QString* reason)
{
    QByteArray body;
    return call(Operation::RunApplication, pack(devicePath), &body, reason);
}

int _ZantDevice::DeleteDeviceFile(const QString& devicePath, QString* reason)
{
    QByteArray body;
    return call(Operation::DeleteDeviceFile, pack(devicePath), &body, reason);
}
