#include "Cli.h"

#include "DelvixVersion.h"
#include "DeviceReportCommands.h"
#include "DeviceStateCommands.h"
#include "FileCommands.h"
#include "Portlex.h"
#include "PortlexErrors.h"
#include "ProgressLine.h"
#include "SafeOutputFile.h"
#include "SnapshotCommands.h"
#include "ToolCommands.h"

#include <QCoreApplication>

#include <cerrno>
#include <cstdio>
#include <unistd.h>

namespace {

const char* const ToolName = "delvix-cli";

void writeOut(FILE* stream, const QString& text)
{
    const QByteArray bytes = text.toLocal8Bit();
    std::fwrite(bytes.constData(), 1, size_t(bytes.size()), stream);
    std::fflush(stream);
}

const char* const OptionsHelp =
    "Options:\n"
    "  --format xml|json|csv   output format (default xml: the document the window exports);\n"
    "                          level also takes junit\n"
    "  -o, --output FILE       write the output to FILE instead of standard output\n"
    "  --csv-raw               CSV: write text cells exactly as the device gave them\n"
    "  --fail-on-difference    compare, diff: exit 1 when the two differ\n"
    "  --hash-limit BYTES      snapshot: hash the content of files up to this size\n"
    "  --volume ID|MOUNT       install: the volume to install to (default: the first)\n"
    "  -h, --help              this help, or a command's help\n"
    "  --version               the version\n"
    "\n"
    "DEVICE is a device id or a unique part of its display name (see \"devices\").\n"
    "-o and pull replace only a regular file: a link or a device node there is refused.\n"
    "XML writes characters it cannot carry as {U+XXXX} (\"{U+\" itself as {U+007B}U+).\n"
    "\n"
    "JSON output is one object naming its schema and version (\"schema\": \"delvix.modules\",\n"
    "\"version\": 1); the schemas are in share/delvix/schema/. CSV has the page's column\n"
    "titles and order. A CSV text cell that a spreadsheet would evaluate as a formula (one\n"
    "starting with =, +, -, @, a tab or a carriage return) is written with a leading ' so\n"
    "that it shows as text; --csv-raw keeps it as it is.\n"
    "\n"
    "Exit status:\n"
    "  0  success\n"
    "  1  check failed: the level is not met, or (with --fail-on-difference) the scans or\n"
    "     snapshots differ\n"
    "  2  usage error: unknown command, option, level or volume, or a name matching several\n"
    "  3  device unavailable: no such device, or it refused the connection\n"
    "  4  gateway or file error: a device call failed, or a file here could not be read or\n"
    "     written (a corrupt snapshot, an unreadable level, an -o file)\n";

} // namespace

Cli::Cli(const QStringList& arguments)
    : m_arguments(arguments)
{
    m_commands = deviceReportCommands() + deviceStateCommands() + fileCommands() + toolCommands() + snapshotCommands();
}

int Cli::run()
{
    QStringList positional;
    bool helpAsked = false;
    bool optionsEnded = false;
    for (int i = 1; i < m_arguments.size(); ++i) {
        const QString argument = m_arguments.at(i);
        if (optionsEnded || !argument.startsWith(QLatin1Char('-')) || argument == QLatin1String("-")) {
            positional.append(argument);
            continue;
        }
        QString name = argument;
        QString value;
        const qsizetype equals = argument.indexOf(QLatin1Char('='));
        const bool inlineValue = argument.startsWith(QLatin1String("--")) && equals > 0;
        if (inlineValue) {
            name = argument.left(equals);
            value = argument.mid(equals + 1);
        }
        const auto takeValue = [&]() -> bool {
            if (inlineValue)
                return true;
            if (i + 1 >= m_arguments.size())
                return false;
            value = m_arguments.at(++i);
            return true;
        };
        if (name == QLatin1String("--")) {
            optionsEnded = true;
        } else if (name == QLatin1String("-h") || name == QLatin1String("--help")) {
            helpAsked = true;
        } else if (name == QLatin1String("--version")) {
            writeOut(stdout, QStringLiteral("%1 %2\n").arg(QLatin1String(ToolName), QLatin1String(DELVIX_VERSION)));
            return ExitSuccess;
        } else if (name == QLatin1String("--fail-on-difference")) {
            m_failOnDifference = true;
        } else if (name == QLatin1String("--csv-raw")) {
            m_csvCells = Report::CsvCells::Raw;
        } else if (name == QLatin1String("--hash-limit")) {
            bool ok = false;
            if (!takeValue() || (m_hashLimit = value.toLongLong(&ok)) < 0 || !ok)
                return usage(QStringLiteral("--hash-limit takes a size in bytes"));
        } else if (name == QLatin1String("--format")) {
            if (!takeValue())
                return usage(QStringLiteral("--format takes xml, json, csv or (level) junit"));
            m_junit = value == QLatin1String("junit");
            if (!m_junit && !Report::parseFormat(value, &m_format))
                return usage(QStringLiteral("--format takes xml, json, csv or (level) junit"));
        } else if (name == QLatin1String("-o") || name == QLatin1String("--output")) {
            if (!takeValue() || value.isEmpty())
                return usage(QStringLiteral("%1 takes a file name").arg(name));
            m_output = value;
        } else if (name == QLatin1String("--volume")) {
            if (!takeValue() || value.isEmpty())
                return usage(QStringLiteral("--volume takes a volume id or mount point"));
            m_volume = value;
        } else {
            return usage(QStringLiteral("unknown option %1").arg(argument));
        }
    }

    if (positional.isEmpty())
        return helpAsked ? help(nullptr) : usage(QStringLiteral("no command given"));
    QString name = positional.takeFirst();
    if (name == QLatin1String("help")) {
        if (positional.isEmpty())
            return help(nullptr);
        name = positional.takeFirst();
        helpAsked = true;
    }
    const CliCommand* command = find(name);
    if (!command)
        return usage(QStringLiteral("unknown command \"%1\"").arg(name));
    if (m_junit && command->name != QLatin1String("level"))
        return usage(QStringLiteral("--format junit is for level only"));
    if (helpAsked)
        return help(command);
    if (positional.size() < command->minArguments || positional.size() > command->maxArguments) {
        return usage(QStringLiteral("usage: %1 %2 %3 (see %1 help %2)")
                         .arg(QLatin1String(ToolName), command->name, command->synopsis));
    }
    m_progressToTerminal = ::isatty(STDERR_FILENO) == 1;
    return command->run(*this, positional);
}

const CliCommand* Cli::find(const QString& name) const
{
    for (const CliCommand& command : m_commands) {
        if (command.name == name)
            return &command;
    }
    return nullptr;
}

int Cli::usage(const QString& message)
{
    return fail(ExitUsage, message + QStringLiteral("\nTry \"%1 --help\".").arg(QLatin1String(ToolName)));
}

int Cli::help(const CliCommand* command)
{
    QString text;
    if (command) {
        text = QStringLiteral("Usage: %1 [OPTIONS] %2 %3\n\n%4\n")
                   .arg(QLatin1String(ToolName), command->name, command->synopsis, command->summary);
        if (!command->details.isEmpty())
            text += QLatin1Char('\n') + command->details + QLatin1Char('\n');
    } else {
        text = QStringLiteral("Usage: %1 [OPTIONS] COMMAND [ARGUMENTS]\n\n"
                              "The devices' data, the level check and the platform tools, without a window.\n\n"
                              "Commands:\n")
                   .arg(QLatin1String(ToolName));
        for (const CliCommand& known : std::as_const(m_commands)) {
            const QString call = known.name + QLatin1Char(' ') + known.synopsis;
            text += QStringLiteral("  %1 %2\n").arg(call, -34).arg(known.summary);
        }
        text += QStringLiteral("\n\"%1 help COMMAND\" tells more about a command.\n").arg(QLatin1String(ToolName));
    }
    text += QLatin1Char('\n') + QLatin1String(OptionsHelp);
    writeOut(stdout, text);
    return ExitSuccess;
}

QSharedPointer<_ZantDevice> Cli::connect(const QString& spec, int* exitCode)
{
    // "" is part of every name: it would pick the only device there is, whichever it is.
    if (spec.isEmpty()) {
        *exitCode = usage(QStringLiteral("DEVICE must not be empty"));
        return {};
    }
    QList<QPair<QString, QString>> devices;
    Portlex::GetDevices(devices);
    QString id;
    QStringList matches;
    for (const auto& device : std::as_const(devices)) {
        if (device.second == spec) {
            id = spec;
            break;
        }
        if (device.first.contains(spec, Qt::CaseInsensitive))
            matches.append(device.second);
    }
    if (id.isEmpty() && matches.size() > 1) {
        *exitCode = usage(QStringLiteral("\"%1\" names several devices: %2").arg(spec, matches.join(QStringLiteral(", "))));
        return {};
    }
    if (id.isEmpty() && matches.size() == 1)
        id = matches.first();
    const QSharedPointer<_ZantDevice> device = id.isEmpty() ? QSharedPointer<_ZantDevice>() : Portlex::GetDevice(id);
    if (!device) {
        *exitCode = fail(ExitDeviceUnavailable, QStringLiteral("no device \"%1\" (\"%2 devices\" lists them)").arg(spec, QLatin1String(ToolName)));
        return {};
    }
    int code = 0;
    QString reason;
    if (!Portlex::ConnectDevice(device, QString(), QString(), &code, &reason)) {
        const QString meaning = PortlexError::describe(code);
        *exitCode = fail(ExitDeviceUnavailable, QStringLiteral("%1 refused the connection: error %2%3 %4")
                                                    .arg(id)
                                                    .arg(code)
                                                    .arg(meaning.isEmpty() ? QString() : QStringLiteral(" (%1)").arg(meaning))
                                                    .arg(reason));
        return {};
    }
    m_deviceId = id;
    for (const auto& known : std::as_const(devices)) {
        if (known.second == id)
            m_deviceName = known.first;
    }
    *exitCode = ExitSuccess;
    return device;
}

int Cli::onDevice(const QString& spec, const std::function<int(_ZantDevice& device)>& work)
{
    int status = ExitSuccess;
    const QSharedPointer<_ZantDevice> device = connect(spec, &status);
    return device ? work(*device) : status;
}

int Cli::emitReport(Report report)
{
    if (!m_deviceId.isEmpty())
        report.setDevice(m_deviceId, m_deviceName);
    return writeOutput(report.write(m_format, m_csvCells));
}

int Cli::writeOutput(const QByteArray& bytes)
{
    if (m_output.isEmpty()) {
        if (std::fwrite(bytes.constData(), 1, size_t(bytes.size()), stdout) != size_t(bytes.size()) || std::fflush(stdout) != 0) {
            // A reader that has seen enough (head, a pager quit early) is a normal end.
            if (errno == EPIPE)
                return ExitSuccess;
            return fail(ExitGatewayOrFileError, QStringLiteral("could not write the output"));
        }
        return ExitSuccess;
    }
    SafeOutputFile file(m_output);
    if (!file.open() || !file.write(bytes) || !file.commit())
        return fail(ExitGatewayOrFileError, QStringLiteral("could not write %1: %2").arg(m_output, file.errorString()));
    return ExitSuccess;
}

int Cli::fail(int code, const QString& message)
{
    if (m_progressLine)
        m_progressLine->end();
    writeOut(stderr, QStringLiteral("%1: %2\n").arg(QLatin1String(ToolName), message));
    return code;
}

int Cli::gatewayFailure(const QString& what, int code, const QString& reason)
{
    QString message = QStringLiteral("%1 failed: error %2").arg(what).arg(code);
    const QString meaning = PortlexError::describe(code);
    if (!meaning.isEmpty())
        message += QStringLiteral(" (%1)").arg(meaning);
    if (!reason.isEmpty())
        message += QStringLiteral(": ") + reason;
    return fail(ExitGatewayOrFileError, message);
}

