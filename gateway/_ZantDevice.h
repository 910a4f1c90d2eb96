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
// failure the output arguments are unchanged.
class QFile;

class _ZantDevice
{
public:
    _ZantDevice(const QString& displayName, const QString& socketPath);
    ~_ZantDevice();
    _ZantDevice(const _ZantDevice&) = delete;
    _ZantDevice& operator=(const _ZantDevice&) = delete;

    QString name;          // display name, e.g. "Zantro Simulator - NAME"
    // The device's last word on a connection or installation, or why it refused a request
    // when it said so.
    QString statusText;
    // Set to ask the device to leave the mode; sent with the next call, then cleared.
    std::atomic<bool> serviceLockRequest { false };
    std::atomic<bool> signatureLockRequest { false };
    DeviceCache cache;     // filled by Portlex::ConnectDevice

    bool Connected() const { return m_connected; }

    int GetModules(QVector<ModuleInfo>& modules, PortlexProgressCallback callback, void* context);
    int GetModuleMif(const QString& modulePath, MifEntry& entry);
    int GetLoadedModules(QVector<LoadedModuleInfo>& processes);
    int GetProcesses(QVector<ProcessInfo>& processes);
    int GetVolumes(QSet<VolumeInfo>& volumes);
    int GetRegistry(QVector<RegistryInfo>& entries, PortlexProgressCallback callback, void* context);
    // Fills the node whose path is set (SetPath) with its values and direct children.
    int GetChildSettings(QSharedPointer<_SettingsInfo>& node);
    // Fills level (made when null) with one directory level of the device.
    int GetFileSystemLevel(const QString& path, QSharedPointer<_DirectoryInfo>& level, PortlexProgressCallback callback,
                           void* context);
    int GetTepSigPrivs(QVector<PriviledgeRecord>& privileges);
    // 0 when enabled; fills the mode's name, its owner and its expiry text.
    EnablementStatus TepStatus(QString& mode, QString& owner, QString& expiry);
    EnablementStatus GlobalTestSigStatus(QString& mode, QString& owner, QString& expiry);

    // Transfers stream the file's bytes and land under a temporary name that is renamed
    // when complete: a failed, cut or cancelled copy leaves no partial file on either side.
    // callback (may be null) gets (-1, size in KiB) first, then (KiB done, size in KiB)
    // as the bytes move, on the calling thread; true from it stops the copy (Cancelled).
    int CopyFileToPC(const QString& devicePath, const QString& localPath, PortlexProgressCallback callback = nullptr,
                     void* context = nullptr);
    int CopyFileToDevice(const QString& localPath, const QString& devicePath, PortlexProgressCallback callback = nullptr,
                         void* context = nullptr);
    // Sends a .zantro package to be extracted into the volume's install folder; statusText
    // tells the outcome (why it was refused, on failure).
    int InstallPackage(const QString& localPath, unsigned short volumeId);
    // Starts the .mod file at devicePath as a process of the device.
    int RunApplication(const QString& devicePath);
    // A file, a link (not what it names), or a directory with its contents.
    int DeleteDeviceFile(const QString& devicePath);

private:
    friend class Portlex;

    // Attaches to the device and fills the cache; false with the code and reason on failure.
    bool attach(const QString& user, const QString& password, int* code, QString* reason);
    QString socketPath() const;
    void setSocketPath(const QString& socketPath);

    // One request on the calling thread's connection, carrying pending lock requests.
    int call(Operation operation, const QByteArray& request, QByteArray* body, QString* error = nullptr);
    // A call whose answer fields are read into fields when the result is 0.
    template <typename... Fields>
    int query(Operation operation, const QByteArray& request, Fields&... fields);
    EnablementStatus enablement(Operation operation, QString& mode, QString& owner, QString& expiry);
    // Streams source into the open upload transferId; a failure ends the transfer on the
    // device.
    int upload(Operation operation, quint32 transferId, QFile& source, PortlexProgressCallback callback, void* context);

    mutable QMutex m_mutex;
    QString m_socketPath;
    QByteArray m_connectRequest;  // the accepted Connect, repeated on every new connection
    std::atomic<bool> m_connected { false };
    std::shared_ptr<int> m_lifetime;  // lets threads' connections notice that the device is gone
};
