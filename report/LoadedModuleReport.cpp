#include "LoadedModuleReport.h"

Report LoadedModuleReport::build(const QVector<LoadedModuleInfo>& processes)
{
    Report report(QStringLiteral("zant-loaded-modules"), QStringLiteral("loaded-modules"), QStringLiteral("module"));
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
