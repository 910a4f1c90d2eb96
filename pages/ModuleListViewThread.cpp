#include "ModuleListViewThread.h"

#include "_ZantDevice.h"

ModuleListViewThread::ModuleListViewThread(GatewayComponentWidget* page, QSharedPointer<_ZantDevice> device,
                                           Feed feed)
    : FetchThread<ModuleInfo>(page, std::move(feed))
    , m_device(std::move(device))
{
}

int ModuleListViewThread::fetch(QVector<ModuleInfo>& records)
{
    return m_device->GetModules(records, nullptr, nullptr);
}

void ModuleListViewThread::reportResult(int result)
{
    if (result == 0)
        reportStatus(QStringLiteral("Processing Device Modules"), GatewayComponentWidget::Processing);
    else
        reportStatus(GatewayComponentWidget::errorStatus(result), GatewayComponentWidget::Failed);
}
