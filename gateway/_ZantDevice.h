#pragma once

#include "EnablementStatus.h"
#include "LoadedModuleInfo.h"
#include "ModuleInfo.h"
#include "ProcessInfo.h"
#include "ProgressCallback.h"
#include "Protocol.h"
#include "RegistryInfo.h"
#include "VolumeInfo.h"
#include "_DirectoryInfo.h"
#include "_SettingsInfo.h"

#include "DeviceCache.h"
#include "MifEntry.h"
#include "PriviledgeRecord.h"

#include <QIODevice>
#include <QMutex>
#include <QSet>
#include <QSharedPointer>
#include <QString>
#include <QVector>

#include <atomic>
#include <memory>

// One device reachable through the gateway. Any thread may call it, several at once:
// each calling thread talks to the device over a connection of its own, and every call
// returns once the device has been silent for Protocol::CallTimeoutMs (a device busy
// with a long request says so, and is waited for). After such a transport failure no
// clean-up call follows: the device drops the connection's transfers with it. Results
// are 0 for success, else a code from PortlexErrors.h or one the device chose; on
// failure the output arguments are unchanged. Each call's reason (may be null) gets that
// call's own explanation: the device's word when it said why it refused, or what went
// wrong on the way, in words without the code (callers show the code beside it); empty
// when there is none. Nothing about one call is kept on the object, so threads never see
// each other's failures.
class QFile;

class _ZantDevice
{
public:
    _ZantDevice(const QString& displayName, const QString& socketPath);
    ~_ZantDevice();
    _ZantDevice(const _ZantDevice&) = delete;
    _ZantDevice& operator=(const _ZantDevice&) = delete;

    QString name;          // display name, e.g. "Zantro Simulator - NAME"
    // Set to ask the device to leave the mode; sent with the next call, then cleared.
    std::atomic<bool> serviceLockRequest { false };
    std::atomic<bool> signatureLockRequest { false };

    bool Connected() const { return m_connected; }
    // What the device described at the last successful Portlex::ConnectDevice (empty and
    // not filled before). Never changed once handed out: a new connect publishes a new
    // record, so a holder reads its own copy while another thread connects again.
    QSharedPointer<const DeviceCache> cache() const;

    int GetModules(QVector<ModuleInfo>& modules, PortlexProgressCallback callback, void* context, QString* reason = nullptr);
    int GetModuleMif(const QString& modulePath, MifEntry& entry, QString* reason = nullptr);
    int GetLoadedModules(QVector<LoadedModuleInfo>& processes, QString* reason = nullptr);
    int GetProcesses(QVector<ProcessInfo>& processes, QString* reason = nullptr);
    int GetVolumes(QSet<VolumeInfo>& volumes, QString* reason = nullptr);
    int GetRegistry(QVector<RegistryInfo>& entries, PortlexProgressCallback callback, void* context, QString* reason = nullptr);
    // Fills the node whose path is set (SetPath) with its values and direct children.
    int GetChildSettings(QSharedPointer<_SettingsInfo>& node, QString* reason = nullptr);
    // Fills level (made when null) with one directory level of the device.
    int GetFileSystemLevel(const QString& path, QSharedPointer<_DirectoryInfo>& level, PortlexProgressCallback callback,
                           void* context, QString* reason = nullptr);
    int GetTepSigPrivs(QVector<PriviledgeRecord>& privileges, QString* reason = nullptr);
    // 0 when enabled; fills the mode's name, its owner and its expiry text.
    EnablementStatus TepStatus(QString& mode, QString& owner, QString& expiry, QString* reason = nullptr);
    EnablementStatus GlobalTestSigStatus(QString& mode, QString& owner, QString& expiry, QString* reason = nullptr);

    // Transfers stream the file's bytes and land under a temporary name that is renamed
    // when complete: a failed, cut or cancelled copy leaves no partial file on either side.
    // callback (may be null) gets (-1, size in KiB) first, then (KiB done, size in KiB)
    // as the bytes move, on the calling thread; true from it stops the copy (Cancelled).
    // The local file is written through SafeOutputFile: never through a link at its name,
    // and never over anything but a regular file.
    int CopyFileToPC(const QString& devicePath, const QString& localPath, PortlexProgressCallback callback = nullptr,
                     void* context = nullptr, QString* reason = nullptr);
    // Sends the size the file had when opened; bytes it gains meanwhile stay behind.
    int CopyFileToDevice(const QString& localPath, const QString& devicePath, PortlexProgressCallback callback = nullptr,
                         void* context = nullptr, QString* reason = nullptr);
    // Sends a .zantro package to be extracted into the volume's install folder; reason
    // gets the device's outcome text, on success too.
    int InstallPackage(const QString& localPath, unsigned short volumeId, QString* reason = nullptr);
    // Starts the .mod file at devicePath as a process of the device.
    int RunApplication(const QString& devicePath, QString* reason = nullptr);
    // A file, a link (not what it names), or a directory with its contents.
    int DeleteDeviceFile(const QString& devicePath, QString* reason = nullptr);

private:
    friend class Portlex;

    // Attaches to the device and publishes a new cache; the code (0 on success) and the
    // device's word on the connection (its greeting or refusal) in code and reason.
    bool attach(const QString& user, const QString& password, int* code, QString* reason);
    QString socketPath() const;
    void setSocketPath(const QString& socketPath);

    // One request on the calling thread's connection, carrying pending lock requests;
    // reason as for the public calls.
    int call(Operation operation, const QByteArray& request, QByteArray* body, QString* reason);
    // A call whose answer fields are read into fields when the result is 0.
    template <typename... Fields>
    int query(Operation operation, const QByteArray& request, QString* reason, Fields&... fields);
    EnablementStatus enablement(Operation operation, QString& mode, QString& owner, QString& expiry, QString* reason);
    // Streams size bytes of source into the open upload transferId; a failure ends the
    // transfer on the device.
    int upload(Operation operation, quint32 transferId, QFile& source, quint64 size, PortlexProgressCallback callback,
               void* context, QString* reason);

    mutable QMutex m_mutex;
    QString m_socketPath;
    QByteArray m_connectRequest;  // the accepted Connect, repeated on every new connection
    QSharedPointer<const DeviceCache> m_cache;
    std::atomic<bool> m_connected { false };
    std::shared_ptr<int> m_lifetime;  // lets threads' connections notice that the device is gone
};
