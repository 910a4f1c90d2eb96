#include "ProcessReport.h"

QString ProcessReport::threadStateText(quint32 state)
{
    switch (state) {
    case 0:
        return QStringLiteral("Included");
    case 1:
        return QStringLiteral("Default");
    case 2:
        return QStringLiteral("Excluded");
    case 3:
        return QStringLiteral("Hard Excluded");
    default:
        return QStringLiteral("Unknown:") + QString::number(state);
    }
}

Report ProcessReport::build(const QVector<ProcessInfo>& processes)
{
    Report report(QStringLiteral("zant-processes"), QStringLiteral("processes"), QStringLiteral("thread"));
    report.root().children.reserve(processes.size());
    for (const ProcessInfo& process : processes) {
        ReportNode& row = report.root()
                              .add(QStringLiteral("process"))
                              .set(QStringLiteral("name"), process.name)
                              .set(QStringLiteral("id"), QString::number(process.id));
        for (const ThreadEntry& thread : process.threads) {
            row.add(QStringLiteral("thread"))
                .set(QStringLiteral("name"), thread.name)
                .set(QStringLiteral("id"), QString::number(thread.id))
                .set(QStringLiteral("state"), threadStateText(thread.state))
                .set(QStringLiteral("priority"), QString::number(thread.priority));
        }
    }
    return report;
}
