#pragma once

#include "FetchThread.h"
#include "ModuleInfo.h"

#include <QSharedPointer>

class _ZantDevice;

// Asks the device for its modules, once, for the module list page.
class ModuleListViewThread : public FetchThread<ModuleInfo>
{
public:
    ModuleListViewThread(GatewayComponentWidget* page, QSharedPointer<_ZantDevice> device, Feed feed);

protected:
    int fetch(QVector<ModuleInfo>& records) override;
    void reportResult(int result) override;

private:
    // Held here as well, so a query still running when the page goes has its device.
    QSharedPointer<_ZantDevice> m_device;
};
