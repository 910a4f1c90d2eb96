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

    static QString executable();                   // zantro-sim beside the test executable
    static QString sampleImage(const QString& name); // samples/devices/<name> of the source tree

    enum class Image
    {
        FreshCopy, // --reset: the image stays as it is
        InPlace,   // for large generated images that nobody else uses
    };

    // Starts serving image as device id and waits until the device answers a handshake.
    bool start(const QString& image, const QString& id, const QStringList& extraArguments = QStringList(),
               Image use = Image::FreshCopy);
    // start, then discovers and connects the device through the gateway; null, with a
    // warning saying why, on failure. The caller has set ZANTRO_SIM_DIR to the socket folder.
    QSharedPointer<_ZantDevice> connectDevice(const QString& image, const QString& id,
                                              const QStringList& extraArguments = QStringList(),
                                              Image use = Image::FreshCopy);
    bool stop();   // SIGTERM, then waits for the process to end
    void kill();   // SIGKILL: the socket file stays behind, as after a crash
    void pause();  // SIGSTOP
    void resume(); // SIGCONT

    bool isRunning() const { return m_process.state() != QProcess::NotRunning; }
    qint64 processId() const { return m_process.processId(); }
    QString socketPath() const { return m_socketPath; }
    QString errorString() const { return m_error; } // why start failed, with what the simulator printed

private:
    QString findSocket(const QString& id) const;
    void sendSignal(int number);
    void removeServedCopy();

    QString m_socketDirectory, m_socketPath, m_error, m_servedCopy;
    QProcess m_process;
};
