#pragma once

#include "LivePollThread.h"
#include "ProcessInfo.h"

class _ZantDevice;

// Polls the device's processes and their threads for the threads page.
class ProcessViewThread : public LivePollThread<ProcessInfo, ThreadEntry>
{
public:
    ProcessViewThread(GatewayComponentWidget* page, QSharedPointer<_ZantDevice> device, Snapshot snapshot);

protected:
    int poll(QVector<ProcessInfo>& list) override;

private:
    // Held here as well, so a poll still running when the page goes has its device.
    QSharedPointer<_ZantDevice> m_device;
};
