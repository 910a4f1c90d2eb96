#include "DeviceListReport.h"

Report DeviceListReport::build(const QList<QPair<QString, QString>>& devices)
{
    Report report(QStringLiteral("zant-devices"), QStringLiteral("devices"), QStringLiteral("device"));
    for (const auto& device : devices)
        report.root().add(QStringLiteral("device")).set(QStringLiteral("id"), device.second).set(QStringLiteral("name"), device.first);
    return report;
}
