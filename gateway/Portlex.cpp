#include "Portlex.h"

#include "DeviceConnection.h"
#include "PortlexErrors.h"
#include "ThreadConnections.h"

#include <QAtomicInt>
#include <QDir>
#include <QFile>
#include <QMap>
#include <QMutex>
#include <QMutexLocker>

#include <sys/stat.h>

#include <memory>
#include <vector>

namespace {

struct Gateway
{
    QMutex mutex;
    QMap<QString, QSharedPointer<_ZantDevice>> devices;
    QAtomicInt holders;
};

Gateway& gateway()
{
    static Gateway instance;
    return instance;
}

bool isSocket(const QString& path)
{
    struct stat info;
    return ::lstat(QFile::encodeName(path).constData(), &info) == 0 && S_ISSOCK(info.st_mode);
}

struct Found
{
    QString name;
    QString id;
    QString socketPath;
};

// Asks every socket at once, so a hung device costs one timeout, not one per device.
QVector<Found> probeSockets(const QStringList& socketPaths)
{
    std::vector<std::unique_ptr<DeviceConnection>> probes;
    for (const QString& path : socketPaths) {
        auto probe = std::make_unique<DeviceConnection>(path);
        if (probe->startHandshake())
            probes.push_back(std::move(probe));
    }
    const QDeadlineTimer deadline(Protocol::DiscoveryTimeoutMs);
    QVector<Found> found;
    for (const auto& probe : probes) {
        if (probe->finishHandshake(deadline) == 0)
            found.append({ probe->displayName(), probe->deviceId(), probe->socketPath() });
    }
    return found;
}

} // namespace

bool Portlex::Initialize()
{
    return true;
}

void Portlex::Destroy()
{
    const int holders = gateway().holders.loadRelaxed();
    if (holders > 0)
        qWarning("Portlex shut down while %d device holders remain", holders);
    ThreadConnections::releaseCurrentThread();
    QMutexLocker lock(&gateway().mutex);
    gateway().devices.clear();
}

void Portlex::Ref()
{
    gateway().holders.ref();
}

void Portlex::Deref()
{
    gateway().holders.deref();
}

unsigned Portlex::GetDevices(QList<QPair<QString, QString>>& devices)
{
    devices.clear();
    const QDir folder(Protocol::socketDirectory());
    QStringList socketPaths;
    const QStringList names = folder.entryList(QDir::System | QDir::Files | QDir::Hidden | QDir::NoDotAndDotDot, QDir::Name);
    for (const QString& name : names) {
        const QString path = folder.filePath(name);
        if (isSocket(path))
            socketPaths << path;
    }
    const QVector<Found> found = probeSockets(socketPaths);

    QMutexLocker lock(&gateway().mutex);
    QSet<QString> listed;
    for (const Found& device : found) {
        if (device.id.isEmpty() || listed.contains(device.id))
            continue;
        listed.insert(device.id);
        QSharedPointer<_ZantDevice>& known = gateway().devices[device.id];
        if (!known)
            known = QSharedPointer<_ZantDevice>::create(device.name, device.socketPath);
        else
            known->setSocketPath(device.socketPath);
        devices.append(qMakePair(device.name, device.id));
    }
    return unsigned(devices.size());
}

QSharedPointer<_ZantDevice> Portlex::GetDevice(const QString& id)
{
    QMutexLocker lock(&gateway().mutex);
    return gateway().devices.value(id);
}

bool Portlex::ConnectDevice(const QSharedPointer<_ZantDevice>& device, const QString& user, const QString& password,
                            int* code, QString* reason)
{
    int result = PortlexError::InvalidArgument;
    QString said = QStringLiteral("No device");
    const bool connected = device && device->attach(user, password, &result, &said);
    if (code)
        *code = result;
    if (reason)
        *reason = said;
    return connected;
}
