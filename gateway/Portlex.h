#pragma once

#include "ProgressCallback.h"
#include "_ZantDevice.h"

#include "MifEntry.h"

#include <QList>
#include <QPair>
#include <QSharedPointer>
#include <QString>

#include <vector>

// The gateway: finds the devices (simulators listening in Protocol::socketDirectory()),
// hands out their objects and connects them. Thread-safe.
class Portlex
{
public:
    static bool Initialize();
    // Forgets every device; objects still held elsewhere stay usable.
    static void Destroy();
    // Holders of device pointers announce themselves, so Destroy can tell who is left.
    static void Ref();
    static void Deref();

    // Lists the reachable devices as (display name, device id); returns their number.
    static unsigned GetDevices(QList<QPair<QString, QString>>& devices);
    // The device with that id as last listed by GetDevices; null if never listed.
    static QSharedPointer<_ZantDevice> GetDevice(const QString& id);
    // Attaches to the device and publishes a new cache. code (may be null) gets 0 or the
    // failure's code, reason (may be null) the device's word on the connection: its
    // greeting, or why it refused.
    static bool ConnectDevice(const QSharedPointer<_ZantDevice>& device, const QString& user, const QString& password,
                              int* code = nullptr, QString* reason = nullptr);

    // Reads every MIF file below directory (suffix "mif" in any case) into entries, ordered
    // by relative path; files that are not readable modules are skipped. callback (may be
    // null) gets the range (-1, file count), then one step per file (index, file name), all
    // on the calling thread; when it answers true the scan stops at once and entries stays
    // empty, since a partial list would pass for the whole platform. Returns the entries count.
    static int GetPlatformClassIds(const QString& directory, std::vector<MifEntry>& entries,
                                   PortlexProgressCallback callback, void* context);
};
