#include "Cli.h"

#include "DelvixVersion.h"
#include "DeviceReportCommands.h"
#include "DeviceStateCommands.h"
#include "FileCommands.h"
#include "Portlex.h"
#include "PortlexErrors.h"
#include "ToolCommands.h"

#include <QCoreApplication>
#include <QSaveFile>

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

// What the gateway's own codes mean; a device's own codes have no name here.
QString codeMeaning(int code)
{
    switch (code) {
    case PortlexError::NotConnected: return QStringLiteral("the device is not connected");
    case PortlexError::Timeout: return QStringLiteral("the device did not answer in time");
    case PortlexError::Unreachable: return QStringLiteral("the device is not reachable");
    case PortlexError::ProtocolError: return QStringLiteral("the device's answer was malformed");
    case PortlexError::VersionMismatch: return QStringLiteral("the device speaks another protocol version");
    case PortlexError::InvalidArgument: return QStringLiteral("invalid argument");
    case PortlexError::LocalFileError: return QStringLiteral("the file on this computer could not be read or written");
    case PortlexError::Untrusted: return QStringLiteral("the device's socket is not the user's own");
    case PortlexError::Cancelled: return QStringLiteral("cancelled");
    case PortlexError::BadRequest: return QStringLiteral("the device could not read the request");
    case PortlexError::PathRefused: return QStringLiteral("the path is refused");
    case PortlexError::NotFound: return QStringLiteral("not found");
    case PortlexError::NoSpace: return QStringLiteral("not enough free space on the volume");
    case PortlexError::IoError: return QStringLiteral("the device could not read or write its file");
    case PortlexError::UnknownOperation: return QStringLiteral("the device does not know the operation");
    case PortlexError::Refused: return QStringLiteral("the device refuses the request");
    case PortlexError::NotRunnable: return QStringLiteral("not a .mod file");
    case PortlexError::IsDirectory: return QStringLiteral("the path is a directory");
    case PortlexError::TransferIncomplete: return QStringLiteral("the transfer ended incomplete");
    default: return QString();
    }
}

const char* const OptionsHelp =
    "Options:\n"
    "  --format xml|json|csv   output format (default xml: the document the window exports)\n"
    "  -o, --output FILE       write the output to FILE instead of standard output\n"
    "  --fail-on-difference    compare: exit 1 when a class is in one scan only\n"
    "  --volume ID|MOUNT       install: the volume to install to (default: the first)\n"
    "  -h, --help              this help, or a command's help\n"
    "  --version               the version\n"
    "\n"
    "DEVICE is a device id or a unique part of its display name (see \"devices\").\n"
    "\n"
    "Exit status: 0 success; 1 the level is not met, or the scans differ (with\n"
    "--fail-on-difference); 2 usage error; 3 no such device, or it refused the connection;\n"
    "4 a gateway or file error.\n";

} // namespace

Cli::Cli(const QStringList& arguments)
    : m_arguments(arguments)
{
    m_commands = deviceReportCommands() + deviceStateCommands() + fileCommands() + toolCommands();
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
        } else if (name == QLatin1String("--format")) {
            if (!takeValue() || !Report::parseFormat(value, &m_format))
                return usage(QStringLiteral("--format takes xml, json or csv"));
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
        *exitCode = fail(ExitNoDevice, QStringLiteral("no device \"%1\" (\"%2 devices\" lists them)").arg(spec, QLatin1String(ToolName)));
        return {};
    }
    if (!Portlex::ConnectDevice(device, QString(), QString())) {
        *exitCode = fail(ExitNoDevice, QStringLiteral("%1 refused the connection: error %2 %3")
                                           .arg(id)
                                           .arg(Portlex::LastError())
                                           .arg(Portlex::LastStatus()));
        return {};
    }
    // The greeting is no reason for a later failure.
    device->statusText.clear();
    *exitCode = ExitSuccess;
    return device;
}

int Cli::onDevice(const QString& spec, const std::function<int(_ZantDevice& device)>& work)
{
    int status = ExitSuccess;
    const QSharedPointer<_ZantDevice> device = connect(spec, &status);
    return device ? work(*device) : status;
}

int Cli::emitReport(const Report& report)
{
    const QByteArray bytes = report.write(m_format);
    if (m_output.isEmpty()) {
        if (std::fwrite(bytes.constData(), 1, size_t(bytes.size()), stdout) != size_t(bytes.size()) || std::fflush(stdout) != 0) {
            // A reader that has seen enough (head, a pager quit early) is a normal end.
            if (errno == EPIPE)
                return ExitSuccess;
            return fail(ExitGatewayError, QStringLiteral("could not write the output"));
        }
        return ExitSuccess;
    }
    QSaveFile file(m_output);
    if (!file.open(QIODevice::WriteOnly) || file.write(bytes) != bytes.size() || !file.commit())
        return fail(ExitGatewayError, QStringLiteral("could not write %1: %2").arg(m_output, file.errorString()));
    return ExitSuccess;
}

int Cli::fail(int code, const QString& message)
{
    endProgress();
    writeOut(stderr, QStringLiteral("%1: %2\n").arg(QLatin1String(ToolName), message));
    return code;
}

int Cli::gatewayFailure(const QString& what, int code, const _ZantDevice* device)
{
    QString message = QStringLiteral("%1 failed: error %2").arg(what).arg(code);
    const QString meaning = codeMeaning(code);
    if (!meaning.isEmpty())
        message += QStringLiteral(" (%1)").arg(meaning);
    if (device && !device->statusText.isEmpty())
        message += QStringLiteral(": ") + device->statusText;
    return fail(ExitGatewayError, message);
}

bool Cli::progress(void* context, int value, int maximum, const QString& text)
{
    auto* cli = static_cast<Cli*>(context);
    if (!cli->m_progressToTerminal)
        return false;
    if (value < 0) {
        cli->m_progressMaximum = maximum;
        return false;
    }
    QString line = cli->m_progressMaximum > 0 ? QStringLiteral("%1/%2").arg(value).arg(cli->m_progressMaximum)
                                              : QString::number(value);
    if (!text.isEmpty())
        line += QLatin1Char(' ') + text;
    // One line, rewritten in place; the erase clears the rest of a longer earlier text.
    writeOut(stderr, QStringLiteral("\r\x1b[K") + line);
    cli->m_progressShown = true;
    return false;
}

void Cli::endProgress()
{
    if (m_progressShown)
        writeOut(stderr, QStringLiteral("\n"));
    m_progressShown = false;
}
