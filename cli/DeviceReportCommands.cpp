#include "DeviceReportCommands.h"

#include "Cli.h"
#include "DeviceListReport.h"
#include "ModuleReport.h"
#include "Portlex.h"

namespace {

int devices(Cli& cli, const QStringList&)
{
    QList<QPair<QString, QString>> found;
    Portlex::GetDevices(found);
    return cli.emitReport(DeviceListReport::build(found));
}

int modules(Cli& cli, const QStringList& arguments)
{
    int status = ExitSuccess;
    const QSharedPointer<_ZantDevice> device = cli.connect(arguments.at(0), &status);
    if (!device)
        return status;
    QVector<ModuleInfo> found;
    if (const int result = device->GetModules(found, nullptr, nullptr))
        return cli.gatewayFailure(QStringLiteral("reading the modules"), result, device.get());
    QVector<QStringList> rows;
    rows.reserve(found.size());
    for (const ModuleInfo& module : std::as_const(found))
        rows.append(ModuleReport::cells(module));
    Report::sortRows(rows, ModuleReport::NameColumn);
    return cli.emitReport(ModuleReport::build(rows));
}

} // namespace

QVector<CliCommand> deviceReportCommands()
{
    return {
        {QStringLiteral("devices"), QString(), QStringLiteral("List the devices the gateway reaches"),
         QStringLiteral("Each device's id and display name, in the gateway's order."), 0, 0, devices},
        {QStringLiteral("modules"), QStringLiteral("DEVICE"), QStringLiteral("List the installed modules"),
         QStringLiteral("The document the Modules page exports, sorted by name."), 1, 1, modules},
    };
}
