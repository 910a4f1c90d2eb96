#include "SettingsReport.h"

Report SettingsReport::build(const QVector<_SettingsInfo>& nodes)
{
    Report report(QStringLiteral("zant-settings"), QStringLiteral("settings"), QStringLiteral("value"));
    report.declare(QStringLiteral("node"),
                   {{QStringLiteral("name"), ReportField::Text, QStringLiteral("Node")},
                    {QStringLiteral("path"), ReportField::Text, QStringLiteral("Path")}});
    report.declare(QStringLiteral("value"),
                   {{QStringLiteral("name"), ReportField::Text, QStringLiteral("Name")},
                    {QStringLiteral("value"), ReportField::Text, QStringLiteral("Value")}});
    report.root().children.reserve(nodes.size());
    for (const _SettingsInfo& node : nodes) {
        ReportNode& row = report.root()
                              .add(QStringLiteral("node"))
                              .set(QStringLiteral("name"), node.Name())
                              .set(QStringLiteral("path"), node.Path());
        for (const auto& value : node.values)
            row.add(QStringLiteral("value")).set(QStringLiteral("name"), value.first).set(QStringLiteral("value"), value.second);
    }
    return report;
}
