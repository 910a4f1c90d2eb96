#include "LoadedModuleReport.h"

Report LoadedModuleReport::build(const QVector<LoadedModuleInfo>& processes)
{
    Report report(QStringLiteral("zant-loaded-modules"), QStringLiteral("loaded-modules"), QStringLiteral("module"));
    report.declare(QStringLiteral("process"),
                   {{QStringLiteral("name"), ReportField::Text, QStringLiteral("Process Name")},
                    {QStringLiteral("id"), ReportField::Integer, QStringLiteral("Process ID")}});
    report.declare(QStringLiteral("module"),
                   {{QStringLiteral("name"), ReportField::Text, QStringLiteral("Module Name")},
                    {QStringLiteral("size"), ReportField::Integer, QStringLiteral("Size")},
                    {QStringLiteral("location"), ReportField::Text, QStringLiteral("Location")}});
    report.root().children.reserve(processes.size());
    for (const LoadedModuleInfo& process : processes) {
        ReportNode& row = report.root()
                              .add(QStringLiteral("process"))
                              .set(QStringLiteral("name"), process.name)
                              .set(QStringLiteral("id"), QString::number(process.id));
        for (const LoadedModuleEntry& module : process.modules) {
            row.add(QStringLiteral("module"))
                .set(QStringLiteral("name"), module.name)
                .set(QStringLiteral("size"), QString::number(module.size))
                .set(QStringLiteral("location"), module.location);
        }
    }
    return report;
}
