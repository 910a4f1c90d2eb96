#include "LoadedModuleViewThread.h"

#include "_ZantDevice.h"

LoadedModuleViewThread::LoadedModuleViewThread(GatewayComponentWidget* page, QSharedPointer<_ZantDevice> device,
                                               Snapshot snapshot)
    : LivePollThread(page, std::move(snapshot), &LoadedModuleInfo::modules, QStringLiteral("Updating Device Modules"))
    , m_device(std::move(device))
{
}

int LoadedModuleViewThread::poll(QVector<LoadedModuleInfo>& list)
{
    return m_device->GetLoadedModules(list);
}
