#pragma once

#include "LivePollThread.h"
#include "LoadedModuleInfo.h"

class _ZantDevice;

// Polls the modules each device process has loaded, for the loaded modules page.
class LoadedModuleViewThread : public LivePollThread<LoadedModuleInfo, LoadedModuleEntry>
{
public:
    LoadedModuleViewThread(GatewayComponentWidget* page, QSharedPointer<_ZantDevice> device, Snapshot snapshot);

protected:
    int poll(QVector<LoadedModuleInfo>& list) override;

private:
    // Held here as well, so a poll still running when the page goes has its device.
    QSharedPointer<_ZantDevice> m_device;
};
