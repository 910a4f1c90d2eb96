#include "DeviceStateCommands.h"

#include "Cli.h"
#include "LoadedModuleReport.h"
#include "ProcessReport.h"
#include "SettingsReport.h"
#include "SnapshotCollector.h"
#include "_ZantDevice.h"

namespace {

int settings(Cli& cli, const QStringList& arguments)
{
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) {
        QVector<_SettingsInfo> nodes;
        QString failed;
        if (const int result = SnapshotCollector::settingsNodes(device, &nodes, &failed))
            return cli.gatewayFailure(QStringLiteral("reading ") + failed, result, QString());
        return cli.emitReport(SettingsReport::build(nodes));
    });
}

int processes(Cli& cli, const QStringList& arguments)
{
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) {
        QVector<ProcessInfo> found;
        QString reason;
        if (const int result = device.GetProcesses(found, &reason))
            return cli.gatewayFailure(QStringLiteral("reading the processes"), result, reason);
        return cli.emitReport(ProcessReport::build(found));
    });
}

int loadedModules(Cli& cli, const QStringList& arguments)
{
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) {
        QVector<LoadedModuleInfo> found;
        QString reason;
        if (const int result = device.GetLoadedModules(found, &reason))
            return cli.gatewayFailure(QStringLiteral("reading the loaded modules"), result, reason);
        return cli.emitReport(LoadedModuleReport::build(found));
    });
}

} // namespace

QVector<CliCommand> deviceStateCommands()
{
    return {
        {QStringLiteral("settings"), QStringLiteral("DEVICE"), QStringLiteral("Write the settings store"),
         QStringLiteral("Every node of the store from the root, each before its children, with its path and\n"
                        "its values."),
         1, 1, settings},
        {QStringLiteral("processes"), QStringLiteral("DEVICE"), QStringLiteral("List the processes and their threads"),
         QStringLiteral("What the Threads page shows, processes and threads by ascending id."), 1, 1, processes},
        {QStringLiteral("loaded-modules"), QStringLiteral("DEVICE"), QStringLiteral("List the modules each process loaded"),
         QStringLiteral("What the Loaded Modules page shows, processes and modules by ascending id."), 1, 1, loadedModules},
    };
}
