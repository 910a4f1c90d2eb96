#pragma once

#include "CliCommand.h"
#include "Report.h"

#include <QSharedPointer>
#include <QString>
#include <QStringList>
#include <QVector>

#include <functional>

class ProgressLine;
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
    Report::Format format() const { return m_format; }
    // --format junit (level only).
    bool junit() const { return m_junit; }
    // The connected device's id.
    QString deviceId() const { return m_deviceId; }
    QString output() const { return m_output; }
    // snapshot: files up to this size get a content hash; -1: none.
    qint64 hashLimit() const { return m_hashLimit; }

    // Runs work on the device that spec names (its id, or a unique part of its display
    // name) once it is connected. The exit status is work's, or says how finding or
    // connecting the device failed.
    int onDevice(const QString& spec, const std::function<int(_ZantDevice& device)>& work);

    // Writes the report in the chosen format, with the connected device's identity, to
    // the output. Returns the exit status.
    int emitReport(Report report);
    // Writes bytes to the output: standard output, or the -o file through a SafeOutputFile
    // (never through a link, never over a device node). Returns the exit status.
    int writeOutput(const QByteArray& bytes);
    // A message on the error stream, ending an open progress line first; returns code.
    int fail(int code, const QString& message);
    // A failed gateway call: its code, what the code means and the call's reason.
    // Returns ExitGatewayOrFileError.
    int gatewayFailure(const QString& what, int code, const QString& reason);

    // Whether progress is shown: only when the error stream is a terminal.
    bool progressToTerminal() const { return m_progressToTerminal; }
    // The progress line in force, ended by fail(); ProgressLine registers itself.
    void setProgressLine(ProgressLine* line) { m_progressLine = line; }

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
    QString m_deviceId;
    QString m_deviceName;
    Report::Format m_format = Report::Format::Xml;
    Report::CsvCells m_csvCells = Report::CsvCells::Guarded;
    qint64 m_hashLimit = -1;
    bool m_failOnDifference = false;
    bool m_junit = false;
    bool m_progressToTerminal = false;
    ProgressLine* m_progressLine = nullptr;
};
