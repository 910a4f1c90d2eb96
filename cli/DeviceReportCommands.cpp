#include "DeviceReportCommands.h"

#include "Cli.h"
#include "ClassReport.h"
#include "DeviceListReport.h"
#include "FamilyReport.h"
#include "LevelFiles.h"
#include "LevelJUnit.h"
#include "LevelCheck.h"
#include "ModuleReport.h"
#include "PhoneInfoReport.h"
#include "Portlex.h"
#include "RegistryReport.h"

#include <QDir>
#include <QFileInfo>

#include <algorithm>

namespace {

int devices(Cli& cli, const QStringList&)
{
    QList<QPair<QString, QString>> found;
    Portlex::GetDevices(found);
    return cli.emitReport(DeviceListReport::build(found));
}

int modules(Cli& cli, const QStringList& arguments)
{
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) {
        QVector<ModuleInfo> found;
        QString reason;
        if (const int result = device.GetModules(found, nullptr, nullptr, &reason))
            return cli.gatewayFailure(QStringLiteral("reading the modules"), result, reason);
        QVector<QStringList> rows;
        rows.reserve(found.size());
        for (const ModuleInfo& module : std::as_const(found))
            rows.append(ModuleReport::cells(module));
        Report::sortRows(rows, ModuleReport::NameColumn);
        return cli.emitReport(ModuleReport::build(rows));
    });
}

int info(Cli& cli, const QStringList& arguments)
{
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) {
        return cli.emitReport(PhoneInfoReport::build(device.cache()->deviceData));
    });
}

int classes(Cli& cli, const QStringList& arguments)
{
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) {
        const QSharedPointer<const DeviceCache> cache = device.cache();
        QVector<QStringList> rows;
        rows.reserve(cache->classes.size());
        for (const IdRecord& record : cache->classes)
            rows.append(ClassReport::cells(record));
        Report::sortRows(rows, ClassReport::NameColumn);
        return cli.emitReport(ClassReport::build(rows, cache->deviceData));
    });
}

int familyTree(Cli& cli, const QStringList& arguments)
{
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) {
        const QSharedPointer<const DeviceCache> cache = device.cache();
        const FamilyReport::Families families =
            FamilyReport::group(FamilyReport::availableClasses(cache->classes), FamilyReport::treeCells);
        return cli.emitReport(FamilyReport::familyTree(families, cache->deviceData));
    });
}

int registry(Cli& cli, const QStringList& arguments)
{
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) {
        QVector<RegistryInfo> entries;
        QString reason;
        if (const int result = device.GetRegistry(entries, nullptr, nullptr, &reason))
            return cli.gatewayFailure(QStringLiteral("reading the registry"), result, reason);
        QVector<QStringList> rows;
        rows.reserve(entries.size());
        for (const RegistryInfo& entry : std::as_const(entries))
            rows.append(RegistryReport::cells(entry));
        Report::sortRows(rows, RegistryReport::ClassTypeColumn);
        return cli.emitReport(RegistryReport::build(rows));
    });
}

// The level file that name stands for: a file of the Levels folder called so (as the level
// page lists it, or with its extension), or a path. Empty, with the exit status in
// *status, when it names none or several.
QString levelFile(Cli& cli, const QString& name, int* status)
{
    QStringList files;
    listLevelFiles(files);
    QStringList known;
    QStringList matches;
    for (const QString& file : std::as_const(files)) {
        const QFileInfo level(file);
        known.append(level.baseName());
        if (name == level.baseName() || name == level.completeBaseName() || name == level.fileName())
            matches.append(file);
    }
    if (matches.size() == 1)
        return matches.first();
    if (matches.size() > 1) {
        *status = cli.fail(ExitUsage, QStringLiteral("\"%1\" names several level files: %2")
                                          .arg(name, matches.join(QStringLiteral(", "))));
        return QString();
    }
    // A path: it has a folder in it, is a file name, or is there.
    if (name.contains(QLatin1Char('/')) || name.contains(QDir::separator()) || name.contains(QLatin1String(".xml"))
        || QFileInfo::exists(name))
        return name;
    known.sort(Qt::CaseInsensitive);
    known.removeDuplicates();
    *status = cli.fail(ExitUsage, QStringLiteral("no level \"%1\"; the known levels are: %2")
                                      .arg(name, known.isEmpty() ? QStringLiteral("none") : known.join(QStringLiteral(", "))));
    return QString();
}

int level(Cli& cli, const QStringList& arguments)
{
    int status = ExitSuccess;
    const QString path = levelFile(cli, arguments.at(1), &status);
    if (path.isEmpty())
        return status;
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) -> int {
        QList<IdRecord> entries;
        QString error;
        if (!LevelCheck::check(path, device.cache()->classes, &entries, &error))
            return cli.fail(ExitGatewayOrFileError, QStringLiteral("cannot read the level %1: %2").arg(path, error));
        const FamilyReport::Families families = FamilyReport::group(entries, LevelCheck::cells);
        const int written = cli.junit()
            ? cli.writeOutput(LevelJUnit::write(families, QFileInfo(path).completeBaseName(), cli.deviceId()))
            : cli.emitReport(FamilyReport::levelReport(families));
        if (written != ExitSuccess)
            return written;
        const bool met = std::all_of(entries.cbegin(), entries.cend(), [](const IdRecord& entry) { return entry.available; });
        return met ? ExitSuccess : ExitCheckFailed;
    });
}

} // namespace

QVector<CliCommand> deviceReportCommands()
{
    return {
        {QStringLiteral("devices"), QString(), QStringLiteral("List the devices the gateway reaches"),
         QStringLiteral("Each device's id and display name, in the gateway's order."), 0, 0, devices},
        {QStringLiteral("modules"), QStringLiteral("DEVICE"), QStringLiteral("List the installed modules"),
         QStringLiteral("The document the Modules page exports, sorted by name."), 1, 1, modules},
        {QStringLiteral("info"), QStringLiteral("DEVICE"), QStringLiteral("Show the device's facts"),
         QStringLiteral("The document the Phone Information page exports (\"phone-info\"): hardware, device and\n"
                        "Zant facts with the page's texts, and the media formats by format name."),
         1, 1, info},
        {QStringLiteral("classes"), QStringLiteral("DEVICE"), QStringLiteral("List the classes the device knows"),
         QStringLiteral("The document the Class IDs page exports, every class of the device, sorted by name."), 1, 1,
         classes},
        {QStringLiteral("family-tree"), QStringLiteral("DEVICE"), QStringLiteral("Group the available classes by family"),
         QStringLiteral("The document the Family Tree page exports: families sorted by name without regard to\n"
                        "letter case, sub-families in the order they first appear, classes by id."),
         1, 1, familyTree},
        {QStringLiteral("registry"), QStringLiteral("DEVICE"), QStringLiteral("List the registry entries"),
         QStringLiteral("The document the Registry page exports, sorted by class type."), 1, 1, registry},
        {QStringLiteral("level"), QStringLiteral("DEVICE LEVEL"), QStringLiteral("Check the device against a level"),
         QStringLiteral("The document the Level page exports: each class the level requires under its family\n"
                        "and sub-family (grouped as \"family-tree\" groups them), \"Found\" or \"Not Found\".\n"
                        "LEVEL is a level of the installed Levels folder or of ~/.local/share/delvix/Levels,\n"
                        "named as the Level page lists it, or the path of a level file.\n"
                        "--format junit writes JUnit XML for CI: a test suite per family, a test case per\n"
                        "class, a failure naming each class not found.\n"
                        "Exit status 1 when a class is not found (after writing the document), 2 for an\n"
                        "unknown level, 4 when the level file cannot be read."),
         2, 2, level},
    };
}
