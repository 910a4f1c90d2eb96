#include "ProcessViewThread.h"

#include "_ZantDevice.h"

ProcessViewThread::ProcessViewThread(GatewayComponentWidget* page, QSharedPointer<_ZantDevice> device, Snapshot snapshot)
    : LivePollThread(page, std::move(snapshot), &ProcessInfo::threads, QStringLiteral("Updating Device Processes"))
    , m_device(std::move(device))
{
}

int ProcessViewThread::poll(QVector<ProcessInfo>& list)
{
    return m_device->GetProcesses(list);
}
