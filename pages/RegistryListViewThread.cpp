#include "RegistryListViewThread.h"

#include "_ZantDevice.h"

RegistryListViewThread::RegistryListViewThread(GatewayComponentWidget* page, QSharedPointer<_ZantDevice> device,
                                               Feed feed)
    : FetchThread<RegistryInfo>(page, std::move(feed))
    , m_device(std::move(device))
{
}

int RegistryListViewThread::fetch(QVector<RegistryInfo>& records)
{
    reportStatus(QStringLiteral("Querying Registry IDs"));
    return m_device->GetRegistry(records, nullptr, nullptr);
}

void RegistryListViewThread::reportResult(int result)
{
    if (result == 0)
        reportStatus(QStringLiteral("Processing Registry Entries"));
    else if (result == RegistryUnavailable)
        reportStatus(QStringLiteral("Registry Object is not available in DelvixStubs.dll1"));
    else
        reportStatus(GatewayComponentWidget::errorStatus(result));
}
