#include "ToolCommands.h"

#include "Cli.h"
#include "MifEntryReport.h"
#include "MifReader.h"
#include "NameLibrary.h"
#include "PlatformScanFile.h"
#include "PlatformScanReport.h"
#include "Portlex.h"
#include "ProgressLine.h"
#include "ScanComparison.h"

#include <QFileInfo>

namespace {

int mifOfFile(Cli& cli, const QString& path)
{
    MifReader reader;
    if (!reader.readFile(path))
        return cli.fail(
            ExitGatewayOrFileError, QStringLiteral("cannot read %1: %2").arg(path, reader.errorString()));
    MifEntry entry;
    if (!reader.decodeModule(entry))
        return cli.fail(ExitGatewayOrFileError, QStringLiteral("%1 holds no module information").arg(path));
    return cli.emitReport(MifEntryReport::build(entry));
}

int mifOfModule(Cli& cli, const QString& deviceName, const QString& module)
{
    return cli.onDevice(deviceName, [&](_ZantDevice& device) {
        QVector<ModuleInfo> modules;
        QString reason;
        if (const int result = device.GetModules(modules, nullptr, nullptr, &reason))
            return cli.gatewayFailure(QStringLiteral("reading the modules"), result, reason);
        QStringList paths;
        for (const ModuleInfo& known : std::as_const(modules)) {
            if (known.path == module) {
                paths = QStringList(known.path);
                break;
            }
            if (known.name == module)
                paths.append(known.path);
        }
        if (paths.isEmpty()) {
            return cli.fail(ExitGatewayOrFileError,
                QStringLiteral("%1 has no module \"%2\" (\"delvix-cli modules %1\" lists them)")
                    .arg(deviceName, module));
        }
        if (paths.size() > 1) {
            return cli.fail(ExitUsage,
                QStringLiteral("several modules are named \"%1\"; give one's path: %2")
                    .arg(module, paths.join(QStringLiteral(", "))));
        }
        MifEntry entry;
        if (const int result = device.GetModuleMif(paths.first(), entry, &reason))
            return cli.gatewayFailure(QStringLiteral("reading %1").arg(paths.first()), result, reason);
        return cli.emitReport(MifEntryReport::build(entry));
    });
}

int mif(Cli& cli, const QStringList& arguments)
{
    initializeLibrary();
    const QString& target = arguments.at(0);
    // A file of that name wins: a local path may hold a colon too. Display names may hold
    // one, module names and paths do not, so the module follows the last colon.
    const qsizetype colon = target.lastIndexOf(QLatin1Char(':'));
    if (QFileInfo(target).isFile() || colon <= 0 || colon == target.size() - 1)
        return mifOfFile(cli, target);
    return mifOfModule(cli, target.left(colon), target.mid(colon + 1));
}

int scan(Cli& cli, const QStringList& arguments)
{
    const QString& folder = arguments.at(0);
    if (!QFileInfo(folder).isDir())
        return cli.fail(ExitGatewayOrFileError, QStringLiteral("%1 is not a folder").arg(folder));
    initializeLibrary();
    std::vector<MifEntry> entries;
    {
        ProgressLine line(cli);
        Portlex::GetPlatformClassIds(folder, entries, &ProgressLine::report, &line);
    }
    if (entries.empty())
        return cli.fail(ExitGatewayOrFileError, QStringLiteral("no module information file below %1").arg(folder));
    return cli.emitReport(PlatformScanReport::build(PlatformScanReport::rows(entries)));
}

int compare(Cli& cli, const QStringList& arguments)
{
    ScanComparison comparison;
    for (const QString& path : arguments) {
        const PlatformScanFile file = PlatformScanFile::read(path);
        if (file.status == PlatformScanFile::Unreadable)
            return cli.fail(ExitGatewayOrFileError, file.errorString);
        if (file.status == PlatformScanFile::WrongFormat)
            return cli.fail(ExitGatewayOrFileError,
                QStringLiteral("%1 is not a platform scan: it has no class list").arg(path));
        const int scan = comparison.addScan(file.header);
        for (const PlatformScanFile::Entry& entry : file.entries)
            comparison.add(scan, entry.name, entry.value, entry.family, entry.subFamily);
    }
    const int status = cli.emitReport(comparison.report());
    if (status != ExitSuccess || !cli.failOnDifference())
        return status;
    for (int c = 0; c < comparison.classes().size(); ++c) {
        if (!comparison.isInEveryScan(c))
            return ExitCheckFailed;
    }
    return ExitSuccess;
}

} // namespace

QVector<CliCommand> toolCommands()
{
    return {
        {QStringLiteral("mif"), QStringLiteral("FILE|DEVICE:MODULE"),
            QStringLiteral("Show a module's MIF entry"),
            QStringLiteral(
                "The document the module information window saves, of a MIF file on this computer\n"
                "or of a device's module, given by its name or its MIF path as \"modules\" lists\n"
                "them (kestrel:equalizer, kestrel:/usermod/equalizer/equalizer.mif).\n"
                "--format csv lists the module's classes."),
            1, 1, mif},
        {QStringLiteral("scan"), QStringLiteral("DIR"),
            QStringLiteral("List the classes a platform build exports"),
            QStringLiteral("Reads every MIF file below DIR and writes the \"platform-scan\" document the\n"
                           "platform class-id window saves: each file's classes, in the order of the files'\n"
                           "paths. \"compare\" reads it back."),
            1, 1, scan},
        {QStringLiteral("compare"), QStringLiteral("SCAN1 SCAN2"),
            QStringLiteral("Compare two platform scans"),
            QStringLiteral("Every class of either scan, once, with where it is present: the document the\n"
                           "comparison window saves. With --fail-on-difference the exit status is 1 when\n"
                           "a class is in one scan only."),
            2, 2, compare},
    };
}
