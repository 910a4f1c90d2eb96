#pragma once

#include "FetchThread.h"
#include "RegistryInfo.h"

#include <QSharedPointer>

class _ZantDevice;

// Asks the device for its registry, once, for the registry page. It reports the outcome by
// the page's status only: the page's state changes when the table is full.
class RegistryListViewThread : public FetchThread<RegistryInfo>
{
public:
    // The result of a device whose registry object is missing.
    static constexpr int RegistryUnavailable = 3;

    RegistryListViewThread(GatewayComponentWidget* page, QSharedPointer<_ZantDevice> device, Feed feed);

protected:
    int fetch(QVector<RegistryInfo>& records) override;
    void reportResult(int result) override;

private:
    // Held here as well, so a query still running when the page goes has its device.
    QSharedPointer<_ZantDevice> m_device;
};
