#include "_ZantDevice.h"

#include "DeviceConnection.h"
#include "PayloadStream.h"
#include "PortlexErrors.h"
#include "RecordStreams.h"
#include "ThreadConnections.h"
#include "TransferProgress.h"

#include <QFileInfo>
#include <QMutexLocker>
#include <QSaveFile>

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

int _ZantDevice::call(Operation operation, const QByteArray& request, QByteArray* body, QString* error)
{
    const bool attaching = operation == Operation::Connect || operation == Operation::GetCache;
    if (!attaching && !m_connected) {
        if (error)
            *error = QStringLiteral("The device is not connected");
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
        if (error)
            *error = connection.errorString();
    } else if (result != 0 && !attaching && body && !body->isEmpty()) {
        // A refusal that says why: that is the device's word for the user.
        PayloadStream in(*body);
        QString reason;
        in >> reason;
        if (in.ok() && !reason.isEmpty())
            statusText = reason;
    }
    return result;
}

template <typename... Fields>
int _ZantDevice::query(Operation operation, const QByteArray& request, Fields&... fields)
{
    QByteArray body;
    const int result = call(operation, request, &body);
    if (result != 0)
        return result;
    PayloadStream in(body);
    (readField(in, fields), ...);
    return in.ok() ? 0 : int(PortlexError::ProtocolError);
}

bool _ZantDevice::attach(const QString& user, const QString& password, int* code, QString* reason)
{
    QByteArray body;
    QString error;
    const QByteArray connect = pack(user, password);
    *code = call(Operation::Connect, connect, &body, &error);
    if (transportFailure(*code)) {
        *reason = error;
        return false;
    }
    PayloadStream in(body);
    QString status;
    in >> status;
    statusText = status;
    if (*code != 0) {
        *reason = status;
        return false;
    }
    {
        QMutexLocker lock(&m_mutex);
        m_connectRequest = connect;
    }
    DeviceCache filled;
    *code = query(Operation::GetCache, QByteArray(), filled);
    if (*code != 0) {
        *reason = QStringLiteral("The device did not give its description (%1)").arg(*code);
        return false;
    }
    cache = filled;
    m_connected = true;
    return true;
}

int _ZantDevice::GetModules(QVector<ModuleInfo>& modules, PortlexProgressCallback, void*)
{
    // The answer arrives as one frame: there are no steps to report.
    QVector<ModuleInfo> answer;
    const int result = query(Operation::GetModules, QByteArray(), answer);
    if (result == 0)
        modules = std::move(answer);
    return result;
}

int _ZantDevice::GetModuleMif(const QString& modulePath, MifEntry& entry)
{
    MifEntry answer;
    const int result = query(Operation::GetModuleMif, pack(modulePath), answer);
    if (result == 0)
        entry = std::move(answer);
    return result;
}

int _ZantDevice::GetLoadedModules(QVector<LoadedModuleInfo>& processes)
{
    QVector<LoadedModuleInfo> answer;
    const int result = query(Operation::GetLoadedModules, QByteArray(), answer);
    if (result == 0)
        processes = std::move(answer);
    return result;
}

int _ZantDevice::GetProcesses(QVector<ProcessInfo>& processes)
{
    QVector<ProcessInfo> answer;
    const int result = query(Operation::GetProcesses, QByteArray(), answer);
    if (result == 0)
        processes = std::move(answer);
    return result;
}

int _ZantDevice::GetVolumes(QSet<VolumeInfo>& volumes)
{
    QVector<VolumeInfo> answer;
    const int result = query(Operation::GetVolumes, QByteArray(), answer);
    if (result == 0)
        volumes = QSet<VolumeInfo>(answer.cbegin(), answer.cend());
    return result;
}

int _ZantDevice::GetRegistry(QVector<RegistryInfo>& entries, PortlexProgressCallback, void*)
{
    QVector<RegistryInfo> answer;
    const int result = query(Operation::GetRegistry, QByteArray(), answer);
    if (result == 0)
        entries = std::move(answer);
    return result;
}

int _ZantDevice::GetChildSettings(QSharedPointer<_SettingsInfo>& node)
{
    if (!node)
        return PortlexError::InvalidArgument;
    _SettingsInfo answer;
    const int result = query(Operation::GetChildSettings, pack(node->Path()), answer);
    if (result == 0)
        *node = std::move(answer);
    return result;
}

int _ZantDevice::GetFileSystemLevel(const QString& path, QSharedPointer<_DirectoryInfo>& level, PortlexProgressCallback,
                                    void*)
{
    _DirectoryInfo answer;
    const int result = query(Operation::GetFileSystemLevel, pack(path), answer);
    if (result == 0) {
        if (!level)
            level = QSharedPointer<_DirectoryInfo>::create();
        *level = std::move(answer);
    }
    return result;
}

int _ZantDevice::GetTepSigPrivs(QVector<PriviledgeRecord>& privileges)
{
    QVector<PriviledgeRecord> answer;
    const int result = query(Operation::GetTepSigPrivs, QByteArray(), answer);
    if (result == 0)
        privileges = std::move(answer);
    return result;
}

EnablementStatus _ZantDevice::TepStatus(QString& mode, QString& owner, QString& expiry)
{
    return enablement(Operation::TepStatus, mode, owner, expiry);
}

EnablementStatus _ZantDevice::GlobalTestSigStatus(QString& mode, QString& owner, QString& expiry)
{
    return enablement(Operation::GlobalTestSigStatus, mode, owner, expiry);
}

EnablementStatus _ZantDevice::enablement(Operation operation, QString& mode, QString& owner, QString& expiry)
{
    qint32 status = EnablementDisabled;
    QString answerMode, answerOwner, answerExpiry;
    const int result = query(operation, QByteArray(), status, answerMode, answerOwner, answerExpiry);
    if (result != 0)
        return EnablementStatus(result);
    mode = answerMode;
    owner = answerOwner;
    expiry = answerExpiry;
    return EnablementStatus(status);
}

int _ZantDevice::upload(Operation operation, quint32 transferId, QFile& source, PortlexProgressCallback callback,
                        void* context)
{
    const quint64 size = quint64(source.size());
    const TransferProgress progress(callback, context, size);
    DeviceConnection& connection = ThreadConnections::forDevice(m_lifetime, socketPath());
    return connection.upload(operation, pack(transferId, size), source.handle(), size,
                             [&progress](quint64 sent) { return progress.cancelled(sent) ? qint32(PortlexError::Cancelled) : 0; },
                             QDeadlineTimer(DeviceConnection::callTimeoutMs()));
}

int _ZantDevice::CopyFileToPC(const QString& devicePath, const QString& localPath, PortlexProgressCallback callback,
                              void* context)
{
    quint32 transferId = 0;
    quint64 size = 0;
    int result = query(Operation::CopyToPCBegin, pack(devicePath), transferId, size);
    if (result != 0)
        return result;
    QSaveFile sink(localPath);
    const TransferProgress progress(callback, context, size);
    if (!sink.open(QIODevice::WriteOnly))
        result = PortlexError::LocalFileError;
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
                if (sink.write(data, length) != length)
                    return PortlexError::LocalFileError;
                received += quint64(length);
                return progress.cancelled(received) ? qint32(PortlexError::Cancelled) : 0;
            },
            QDeadlineTimer(DeviceConnection::callTimeoutMs()));
        streamed = result == 0;
        // The file shrank on the device while it was sent.
        if (streamed && received != size)
            result = PortlexError::TransferIncomplete;
    }
    // A stream that failed took the transfer with it (the device ended it, or the dropped
    // connection did); otherwise it is still open.
    if (streamed || !started) {
        QByteArray body;
        const int ended = call(Operation::CopyToPCEnd, pack(transferId), &body);
        if (result == 0)
            result = ended;
    }
    if (result != 0) {
        sink.cancelWriting();
        return result;
    }
    return sink.commit() ? 0 : int(PortlexError::LocalFileError);
}

int _ZantDevice::CopyFileToDevice(const QString& localPath, const QString& devicePath, PortlexProgressCallback callback,
                                  void* context)
{
    QFile source(localPath);
    if (!QFileInfo(localPath).isFile() || !source.open(QIODevice::ReadOnly))
        return PortlexError::LocalFileError;
    quint32 transferId = 0;
    int result = query(Operation::CopyToDeviceBegin, pack(devicePath, quint64(source.size())), transferId);
    if (result != 0)
        return result;
    result = upload(Operation::UploadStream, transferId, source, callback, context);
    if (result != 0)
        return result;
    QByteArray body;
    return call(Operation::CopyToDeviceCommit, pack(transferId), &body);
}

int _ZantDevice::InstallPackage(const QString& localPath, unsigned short volumeId)
{
    QFile package(localPath);
    if (!QFileInfo(localPath).isFile() || !package.open(QIODevice::ReadOnly)) {
        statusText = QStringLiteral("Cannot read the package %1").arg(localPath);
        return PortlexError::LocalFileError;
    }
    const QString name = QFileInfo(localPath).fileName();
    QByteArray body;
    int result = call(Operation::InstallPackageBegin, pack(volumeId, name, quint64(package.size())), &body);
    quint32 transferId = 0;
    QString status;
    PayloadStream begun(body);
    if (result == 0)
        begun >> transferId;
    begun >> status;
    if (result == 0 && begun.ok())
        result = upload(Operation::UploadStream, transferId, package, nullptr, nullptr);
    if (result == 0) {
        result = call(Operation::InstallPackageCommit, pack(transferId), &body);
        PayloadStream committed(body);
        committed >> status;
    }
    if (status.isEmpty())
        status = result == 0 ? QStringLiteral("%1 installed").arg(name)
                             : QStringLiteral("The package %1 was not installed (error %2)").arg(name).arg(result);
    statusText = status;
    return result;
}

int _ZantDevice::RunApplication(const QString& devicePath)
{
    QByteArray body;
    return call(Operation::RunApplication, pack(devicePath), &body);
}

int _ZantDevice::DeleteDeviceFile(const QString& devicePath)
{
    QByteArray body;
    return call(Operation::DeleteDeviceFile, pack(devicePath), &body);
}
