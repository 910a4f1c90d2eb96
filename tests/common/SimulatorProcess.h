#pragma once

#include <QProcess>
#include <QSharedPointer>
#include <QString>
#include <QStringList>

class _ZantDevice;

// A zantro-sim process for tests: serves a fresh copy of an image (--reset) in a given
// socket folder and is stopped when the object goes. The copy goes with it, even after kill().
class SimulatorProcess
{
public:
    explicit SimulatorProcess(const QString& socketDirectory);
    ~SimulatorProcess();
    SimulatorProcess(const SimulatorProcess&) = delete;
    SimulatorProcess& operator=(const SimulatorProcess&) = delete;

    // zantro-sim beside the running test executable.
    static QString executable();
    // samples/devices/<name> of the source tree.
    static QString sampleImage(const QString& name);

    enum class Image
    {
        FreshCopy,  // --reset: the image stays as it is
        InPlace,    // for large generated images that nobody else uses
    };

    // Starts serving image as device id and waits until the device answers a handshake.
    bool start(const QString& image, const QString& id, const QStringList& extraArguments = QStringList(),
               Image use = Image::FreshCopy);
    // start, then discovers and connects the device through the gateway; null, with a
    // warning saying why, on failure. The caller has set ZANTRO_SIM_DIR to the socket folder.
    QSharedPointer<_ZantDevice> connectDevice(const QString& image, const QString& id,
                                              const QStringList& extraArguments = QStringList(),
                                              Image use = Image::FreshCopy);
    // SIGTERM, then waits for the process to end.
    bool stop();
    // SIGKILL: the socket file stays behind, as after a crash.
    void kill();
    void pause();   // SIGSTOP
    void resume();  // SIGCONT

    bool isRunning() const { return m_process.state() != QProcess::NotRunning; }
    qint64 processId() const { return m_process.processId(); }
    QString socketPath() const { return m_socketPath; }
    // Why start failed, with what the simulator printed.
    QString errorString() const { return m_error; }

private:
    QString findSocket(const QString& id) const;
    void sendSignal(int number);
    void removeServedCopy();

    QString m_socketDirectory;
    QString m_socketPath;
    QString m_error;
    QString m_servedCopy;
    QProcess m_process;
};
