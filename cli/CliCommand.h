#pragma once

#include <QString>
#include <QStringList>
#include <QVector>

class Cli;

// What a pipeline can tell from the exit status. The numbers are an interface: they never change.
enum ExitCode : int
{
    ExitSuccess = 0,
    ExitCheckFailed = 1,        // the level is not met, or the scans or snapshots differ (when asked to fail on it)
    ExitUsage = 2,              // bad arguments: an unknown command, option, level or volume, an ambiguous name
    ExitDeviceUnavailable = 3,  // no such device, or it refused the connection
    ExitGatewayOrFileError = 4, // a gateway call failed, or a file here could not be read or written
};

// One command of the tool: its name, how it is called and what it does.
struct CliCommand
{
    QString name;
    QString synopsis;   // the arguments, e.g. "DEVICE SRC DST"
    QString summary;    // one line for the command list
    QString details;    // the rest of the command's help; may be empty
    int minArguments = 0;
    int maxArguments = 0;
    int (*run)(Cli& cli, const QStringList& arguments) = nullptr;
};
