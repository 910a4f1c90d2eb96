#pragma once

#include "Answer.h"
#include "Request.h"
#include "TransferTable.h"
#include "VolumePathResolver.h"

#include <functional>

class DeviceState;

// The operations that change the device: file transfers both ways, package installation,
// running a module and deleting files. Every device path goes through the state's
// VolumePathResolver, so nothing outside a volume's folder is read or changed. System
// module folders are read-only, and names the device keeps for its temporary files are
// refused.
class DeviceActions
{
public:
    static constexpr int DefaultRunLifetimeMs = 10000;
    // A transfer its client has not moved for this long is ended, and its room given back.
    static constexpr qint64 TransferIdleLimitMs = 30000;

    explicit DeviceActions(DeviceState& state);

    // How long a process started by RunApplication lives.
    void setRunLifetime(int milliseconds) { m_runLifetimeMs = milliseconds; }
    // Milliseconds of a monotonic clock that ages the transfers; tests put in their own.
    void setClock(std::function<qint64()> clock) { m_clock = std::move(clock); }

    static bool isAction(Operation operation);
    Answer handle(const Request& request);
    // The client went away: its unfinished transfers leave nothing behind.
    void connectionClosed(quint64 connectionId) { m_transfers.discardConnection(connectionId); }

    // The bytes of an open transfer's stream (see RequestHandler).
    qint64 readStream(quint64 connectionId, quint32 id, char* data, qint64 max);
    qint32 writeStream(quint64 connectionId, quint32 id, const char* data, qint64 size);

    // Rolls back the installs a kill cut short, then removes the temporary files and
    // folders that a crash left in the volumes.
    void sweepLeftovers();

private:
    Answer copyToPCBegin(const Request& request);
    // Accepts a stream request for an open transfer of the connection.
    Answer openStream(const Request& request, TransferTable::Kind kind);
    // The connection's open transfer of that kind (an upload: of either kind), marked active.
    TransferTable::Transfer* streamed(quint64 connectionId, quint32 id, TransferTable::Kind kind);
    Answer copyToDeviceBegin(const Request& request);
    // A copy into folders that do not exist yet: the deepest folder that does holds the
    // partial file (staging), and the missing ones are made when the copy completes.
    VolumePathResolver::Status resolveInNewFolders(const QString& devicePath, VolumePathResolver::Target& target,
                                                   QString& staging) const;
    Answer copyToDeviceCommit(const Request& request);
    Answer installBegin(const Request& request);
    Answer installCommit(const Request& request);
    Answer endTransfer(const Request& request, TransferTable::Kind kind);
    Answer run(const Request& request);
    Answer remove(const Request& request);

    quint64 roomLeft(int volume);
    QString refusedEntry(const QString& relativePath) const;

    DeviceState& m_state;
    TransferTable m_transfers;
    int m_runLifetimeMs = DefaultRunLifetimeMs;
    std::function<qint64()> m_clock;
    qint64 m_now = 0; // the clock when the request being handled arrived
};
