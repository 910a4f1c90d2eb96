#include "FileCommands.h"

#include "Cli.h"
#include "FolderReport.h"
#include "ProgressLine.h"
#include "_ZantDevice.h"

#include <QDir>
#include <QFileInfo>

#include <algorithm>

namespace {

int list(Cli& cli, const QStringList& arguments)
{
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) -> int {
        QSharedPointer<_DirectoryInfo> level;
        QString reason;
        if (const int result = device.GetFileSystemLevel(arguments.at(1), level, nullptr, nullptr, &reason))
            return cli.gatewayFailure(QStringLiteral("listing %1").arg(arguments.at(1)), result, reason);
        return cli.emitReport(FolderReport::build(*level));
    });
}

int pull(Cli& cli, const QStringList& arguments)
{
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) -> int {
        const QString source = arguments.at(1);
        QString target = arguments.at(2);
        if (QFileInfo(target).isDir())
            target = QDir(target).filePath(source.mid(source.lastIndexOf(QLatin1Char('/')) + 1));
        ProgressLine line(cli);
        QString reason;
        const int result = device.CopyFileToPC(source, target, &ProgressLine::report, &line, &reason);
        if (result)
            return cli.gatewayFailure(QStringLiteral("copying %1 from the device").arg(source), result, reason);
        return ExitSuccess;
    });
}

int push(Cli& cli, const QStringList& arguments)
{
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) -> int {
        const QString source = arguments.at(1);
        QString target = arguments.at(2);
        if (target.endsWith(QLatin1Char('/')))
            target += QFileInfo(source).fileName();
        ProgressLine line(cli);
        QString reason;
        const int result = device.CopyFileToDevice(source, target, &ProgressLine::report, &line, &reason);
        if (result)
            return cli.gatewayFailure(QStringLiteral("copying %1 to the device").arg(source), result, reason);
        return ExitSuccess;
    });
}

int install(Cli& cli, const QStringList& arguments)
{
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) -> int {
        QSet<VolumeInfo> found;
        QString reason;
        if (const int result = device.GetVolumes(found, &reason))
            return cli.gatewayFailure(QStringLiteral("reading the volumes"), result, reason);
        // By default the first volume by mount point, the one the file system page starts with.
        QList<VolumeInfo> volumes(found.cbegin(), found.cend());
        std::sort(volumes.begin(), volumes.end(), [](const VolumeInfo& a, const VolumeInfo& b) { return a.mountPoint < b.mountPoint; });
        const QString wanted = cli.volume();
        const auto chosen = std::find_if(volumes.cbegin(), volumes.cend(), [&wanted](const VolumeInfo& volume) {
            return wanted.isEmpty() || volume.mountPoint == wanted || QString::number(volume.volumeId) == wanted;
        });
        if (chosen == volumes.cend())
            return cli.fail(ExitUsage, wanted.isEmpty() ? QStringLiteral("the device has no volume")
                                                        : QStringLiteral("the device has no volume %1").arg(wanted));
        const int result = device.InstallPackage(arguments.at(1), quint16(chosen->volumeId), &reason);
        if (result)
            return cli.gatewayFailure(QStringLiteral("installing %1").arg(arguments.at(1)), result, reason);
        return cli.writeOutput((reason + QLatin1Char('\n')).toUtf8());
    });
}

int run(Cli& cli, const QStringList& arguments)
{
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) -> int {
        QString reason;
        if (const int result = device.RunApplication(arguments.at(1), &reason))
            return cli.gatewayFailure(QStringLiteral("running %1").arg(arguments.at(1)), result, reason);
        return ExitSuccess;
    });
}

int remove(Cli& cli, const QStringList& arguments)
{
    return cli.onDevice(arguments.at(0), [&](_ZantDevice& device) -> int {
        QString reason;
        if (const int result = device.DeleteDeviceFile(arguments.at(1), &reason))
            return cli.gatewayFailure(QStringLiteral("deleting %1").arg(arguments.at(1)), result, reason);
        return ExitSuccess;
    });
}

} // namespace

QVector<CliCommand> fileCommands()
{
    return {
        {QStringLiteral("ls"), QStringLiteral("DEVICE PATH"), QStringLiteral("List one folder of the device"),
         QStringLiteral("The folder's sub-folders, then its files with their size in bytes and attributes."), 2, 2, list},
        {QStringLiteral("pull"), QStringLiteral("DEVICE SRC DST"), QStringLiteral("Copy a file from the device"),
         QStringLiteral("DST is a file, or an existing folder that receives the file under its own name. A failed\n"
                        "copy leaves nothing behind."),
         3, 3, pull},
        {QStringLiteral("push"), QStringLiteral("DEVICE SRC DST"), QStringLiteral("Copy a file to the device"),
         QStringLiteral("DST is a device path; one that ends in \"/\" is a folder that receives the file under its\n"
                        "own name. Missing folders are made. A failed copy leaves nothing behind."),
         3, 3, push},
        {QStringLiteral("install"), QStringLiteral("DEVICE PACKAGE"), QStringLiteral("Install a .zantro package"),
         QStringLiteral("Installs onto the --volume given, else onto the first volume by mount point, and\n"
                        "writes the device's word on it to the output (standard output, or the -o file)."),
         2, 2, install},
        {QStringLiteral("run"), QStringLiteral("DEVICE PATH"), QStringLiteral("Start a .mod file on the device"), QString(),
         2, 2, run},
        {QStringLiteral("rm"), QStringLiteral("DEVICE PATH"), QStringLiteral("Delete a file or folder on the device"),
         QStringLiteral("A folder goes with its contents."), 2, 2, remove},
    };
}
