#pragma once

#include "CliCommand.h"
#include "Report.h"

#include <QSharedPointer>
#include <QString>
#include <QStringList>
#include <QVector>

#include <functional>

class _ZantDevice;

// The command line tool: reads the arguments, runs one command and gives its exit status.
// Commands reach the devices, the output and the error stream through it.
class Cli
{
public:
    explicit Cli(const QStringList& arguments);

    int run();

    // Options the commands read.
    bool failOnDifference() const { return m_failOnDifference; }
    QString volume() const { return m_volume; }

    // Runs work on the device that spec names (its id, or a unique part of its display
    // name) once it is connected. The exit status is work's, or says how finding or
    // connecting the device failed.
    int onDevice(const QString& spec, const std::function<int(_ZantDevice& device)>& work);

    // Writes the report in the chosen format to the output: standard output, or the -o
    // file through a SafeOutputFile (never through a link, never over a device node).
    // Returns the exit status.
    int emitReport(const Report& report);
    // A message on the error stream; returns code.
    int fail(int code, const QString& message);
    // A failed gateway call: its code and the call's reason. Returns ExitGatewayError.
    int gatewayFailure(const QString& what, int code, const QString& reason);

    // Progress on the error stream, when that is a terminal; the gateway's callback form,
    // with this tool as context. Never asks to stop.
    static bool progress(void* context, int value, int maximum, const QString& text);
    // Ends the progress line, if one is shown.
    void endProgress();

private:
    int usage(const QString& message);
    int help(const CliCommand* command);
    const CliCommand* find(const QString& name) const;
    // The device that spec names, connected; null after the failure is reported, with the
    // exit status in *exitCode.
    QSharedPointer<_ZantDevice> connect(const QString& spec, int* exitCode);

    QVector<CliCommand> m_commands;
    QStringList m_arguments;
    QString m_output;
    QString m_volume;
    Report::Format m_format = Report::Format::Xml;
    bool m_failOnDifference = false;
    // Progress state: the range in force and whether a line is open on the terminal.
    int m_progressMaximum = 0;
    bool m_progressShown = false;
    bool m_progressToTerminal = false;
};
