#include "SnapshotCommands.h"

#include "Cli.h"
#include "ProgressLine.h"
#include "SnapshotCollector.h"
#include "SnapshotDiff.h"
#include "SnapshotFile.h"

#include <QFileInfo>
#include <QJsonDocument>

namespace {

// The snapshot of the device spec names, taken now. Returns the exit status.
int takeSnapshot(Cli& cli, const QString& spec, qint64 hashLimit, QJsonObject* snapshot)
{
    return cli.onDevice(spec, [&](_ZantDevice& device) -> int {
        ProgressLine line(cli);
        QString step;
        if (const int result = SnapshotCollector::collect(device, cli.deviceId(), hashLimit, snapshot, &step,
                                                          &ProgressLine::report, &line))
            return cli.gatewayFailure(QStringLiteral("reading %1").arg(step), result, QString());
        return ExitSuccess;
    });
}

int snapshot(Cli& cli, const QStringList& arguments)
{
    if (cli.junit() || cli.format() == Report::Format::Csv)
        return cli.fail(ExitUsage, QStringLiteral("a snapshot is one JSON document; --format takes json only"));
    QJsonObject taken;
    if (const int status = takeSnapshot(cli, arguments.at(0), cli.hashLimit(), &taken))
        return status;
    return cli.writeOutput(QJsonDocument(taken).toJson(QJsonDocument::Compact));
}

int diff(Cli& cli, const QStringList& arguments)
{
    if (cli.junit() || cli.format() == Report::Format::Csv)
        return cli.fail(ExitUsage, QStringLiteral("diff writes text, or JSON with --format json"));
    QJsonObject sides[2];
    bool isFile[2] = {false, false};
    qint64 fileHashLimit = -1;
    for (int i = 0; i < 2; ++i) {
        isFile[i] = QFileInfo(arguments.at(i)).isFile();
        if (!isFile[i])
            continue;
        QString error;
        if (!SnapshotFile::read(arguments.at(i), &sides[i], &error))
            return cli.fail(ExitGatewayOrFileError, QStringLiteral("cannot read the snapshot %1: %2").arg(arguments.at(i), error));
        const QJsonValue limit =
            sides[i].value(QStringLiteral("manifest")).toObject().value(QStringLiteral("hash-limit"));
        if (limit.isDouble())
            fileHashLimit = limit.toInteger();
    }
    // A device compared with a file is hashed as the file was, so that hashes meet hashes.
    const qint64 hashLimit = cli.hashLimit() >= 0 ? cli.hashLimit() : fileHashLimit;
    for (int i = 0; i < 2; ++i) {
        if (isFile[i])
            continue;
        if (const int status = takeSnapshot(cli, arguments.at(i), hashLimit, &sides[i]))
            return status;
    }
    const SnapshotDiff difference(sides[0], sides[1]);
    const int written = cli.format() == Report::Format::Json
        ? cli.writeOutput(QJsonDocument(difference.json()).toJson(QJsonDocument::Indented))
        : cli.writeOutput(difference.text().toUtf8());
    if (written != ExitSuccess)
        return written;
    return cli.failOnDifference() && !difference.isEmpty() ? ExitCheckFailed : ExitSuccess;
}

} // namespace

QVector<CliCommand> snapshotCommands()
{
    return {
        {QStringLiteral("snapshot"), QStringLiteral("DEVICE"), QStringLiteral("Save the device's whole state to one file"),
         QStringLiteral("Writes one JSON document (schema \"delvix.snapshot\", version 1) to the output, best\n"
                        "given with -o FILE: a manifest (the device's id and name, the time, the program's\n"
                        "version, the documents' schema versions) and every document: phone information,\n"
                        "modules, classes, registry, settings, processes, loaded modules and the files of\n"
                        "every volume with their sizes. --hash-limit BYTES adds a SHA-256 of the content of\n"
                        "each file up to that size (each such file is read from the device)."),
         1, 1, snapshot},
        {QStringLiteral("diff"), QStringLiteral("A B"), QStringLiteral("Show what changed between two snapshots or devices"),
         QStringLiteral("A and B are each a snapshot file or a running DEVICE. Lists modules added, removed or\n"
                        "with another version or signature; classes added, removed or whose availability\n"
                        "changed; registry entries and settings added, removed or changed; files added,\n"
                        "removed or with another size or hash. Processes and loaded modules are not\n"
                        "compared. The text gives the counts first, then each group; --format json writes\n"
                        "the \"delvix.diff\" document. A device read against a file is hashed with the\n"
                        "file's hash limit unless --hash-limit is given.\n"
                        "With --fail-on-difference the exit status is 1 when anything differs; a corrupt\n"
                        "or truncated snapshot file exits 4."),
         2, 2, diff},
    };
}
