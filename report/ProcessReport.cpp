#include "ProcessReport.h"

#include "DisplayText.h"

Report ProcessReport::build(const QVector<ProcessInfo>& processes)
{
    Report report(QStringLiteral("zant-processes"), QStringLiteral("processes"), QStringLiteral("thread"));
    report.declare(QStringLiteral("process"),
                   {{QStringLiteral("name"), ReportField::Text, QStringLiteral("Process Name")},
                    {QStringLiteral("id"), ReportField::Integer, QStringLiteral("Process ID")}});
    report.declare(QStringLiteral("thread"),
                   {{QStringLiteral("name"), ReportField::Text, QStringLiteral("Thread Name")},
                    {QStringLiteral("id"), ReportField::Integer, QStringLiteral("ID")},
                    {QStringLiteral("state"), ReportField::Text, QStringLiteral("State")},
                    {QStringLiteral("priority"), ReportField::Integer, QStringLiteral("Priority")}});
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
                .set(QStringLiteral("state"), DisplayText::threadState(thread.state))
                .set(QStringLiteral("priority"), QString::number(thread.priority));
        }
    }
    return report;
}
