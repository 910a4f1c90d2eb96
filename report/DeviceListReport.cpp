#include "DeviceListReport.h"

Report DeviceListReport::build(const QList<QPair<QString, QString>>& devices)
{
    Report report(QStringLiteral("zant-devices"), QStringLiteral("devices"), QStringLiteral("device"));
    report.declare(QStringLiteral("device"),
                   {{QStringLiteral("id"), ReportField::Text, QStringLiteral("Device ID")},
                    {QStringLiteral("name"), ReportField::Text, QStringLiteral("Name")}});
    for (const auto& device : devices)
        report.root().add(QStringLiteral("device")).set(QStringLiteral("id"), device.second).set(QStringLiteral("name"), device.first);
    return report;
}
