#pragma once

#include <QString>

#include <memory>
#include <unordered_map>

class DeviceConnection;

// The calling thread's connections, one per device. A connection belongs to the thread
// that made it and is destroyed by that thread when it ends, so sockets are never
// touched from two threads and page workers that come and go leave nothing behind.
class ThreadConnections
{
public:
    // The calling thread's connection to the device identified by owner (alive while the
    // device lives); made on first use, remade when the socket path changed.
    static DeviceConnection& forDevice(const std::shared_ptr<void>& owner, const QString& socketPath);
    // Drops every connection of the calling thread.
    static void releaseCurrentThread();

    ~ThreadConnections();

private:
    struct Entry
    {
        std::weak_ptr<void> owner;
        std::unique_ptr<DeviceConnection> connection;
    };
    std::unordered_map<const void*, Entry> m_entries;
};
