#include "ThreadConnections.h"

#include "DeviceConnection.h"

#include <QThreadStorage>

namespace {

QThreadStorage<ThreadConnections*>& storage()
{
    static QThreadStorage<ThreadConnections*> perThread;
    return perThread;
}

bool sameOwner(const std::weak_ptr<void>& a, const std::shared_ptr<void>& b)
{
    return !a.owner_before(b) && !b.owner_before(a);
}

} // namespace

ThreadConnections::~ThreadConnections() = default;

DeviceConnection& ThreadConnections::forDevice(const std::shared_ptr<void>& owner, const QString& socketPath)
{
    if (!storage().hasLocalData())
        storage().setLocalData(new ThreadConnections);
    auto& entries = storage().localData()->m_entries;

    // Forget devices that are gone, so a long-lived thread does not collect sockets.
    for (auto it = entries.begin(); it != entries.end();) {
        if (it->second.owner.expired())
            it = entries.erase(it);
        else
            ++it;
    }

    Entry& entry = entries[owner.get()];
    if (!entry.connection || !sameOwner(entry.owner, owner) || entry.connection->socketPath() != socketPath) {
        entry.owner = owner;
        entry.connection = std::make_unique<DeviceConnection>(socketPath);
    }
    return *entry.connection;
}

void ThreadConnections::releaseCurrentThread()
{
    if (storage().hasLocalData())
        storage().setLocalData(nullptr);
}
