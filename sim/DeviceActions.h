#pragma once

#include "Answer.h"
#include "Request.h"
#include "TransferTable.h"

class DeviceState;

// The operations that change the device: file transfers both ways, package installation,
// running a module and deleting files. Every device path goes through the state's
// VolumePathResolver, so nothing outside a volume's folder is read or changed.
class DeviceActions
{
public:
    static constexpr int DefaultRunLifetimeMs = 10000;

    explicit DeviceActions(DeviceState& state);

    // How long a process started by RunApplication lives.
    void setRunLifetime(int milliseconds) { m_runLifetimeMs = milliseconds; }

    static bool isAction(Operation operation);
    Answer handle(const Request& request);
    // The client went away: its unfinished transfers leave nothing behind.
    void connectionClosed(quint64 connectionId) { m_transfers.discardConnection(connectionId); }

    // Removes the temporary files and folders that a crash left in the volumes.
    void sweepLeftovers();

private:
    Answer copyToPCBegin(const Request& request);
    Answer copyToPCChunk(const Request& request);
    Answer copyToDeviceBegin(const Request& request);
    Answer uploadChunk(const Request& request);
    Answer copyToDeviceCommit(const Request& request);
    Answer installBegin(const Request& request);
    Answer installCommit(const Request& request);
    Answer endTransfer(const Request& request, TransferTable::Kind kind);
    Answer run(const Request& request);
    Answer remove(const Request& request);

    quint64 roomLeft(int volume);

    DeviceState& m_state;
    TransferTable m_transfers;
    int m_runLifetimeMs = DefaultRunLifetimeMs;
};
