#include "SimulatorProcess.h"

#include "DeviceConnection.h"
#include "Portlex.h"

#include <QCoreApplication>
#include <QDeadlineTimer>
#include <QDir>

#include <signal.h>

SimulatorProcess::SimulatorProcess(const QString& socketDirectory)
    : m_socketDirectory(socketDirectory)
{
    m_process.setProcessChannelMode(QProcess::MergedChannels);
}

SimulatorProcess::~SimulatorProcess()
{
    resume();
    stop();
}

QString SimulatorProcess::executable() { return QCoreApplication::applicationDirPath() + QStringLiteral("/zantro-sim"); }

QString SimulatorProcess::sampleImage(const QString& name) { return QStringLiteral(DELVIX_SAMPLES_DIR "/devices/") + name; }

bool SimulatorProcess::start(const QString& image, const QString& id, const QStringList& extraArguments, Image use)
{
    m_error.clear();
    m_socketPath.clear();
    removeServedCopy();
    const QStringList reset = use == Image::FreshCopy ? QStringList {QStringLiteral("--reset")} : QStringList();
    m_process.start(executable(), QStringList {"--image", image, "--id", id, "--socket-dir", m_socketDirectory} + reset + extraArguments);
    if (!m_process.waitForStarted()) {
        m_error = m_process.errorString();
        return false;
    }
    for (const QDeadlineTimer deadline(20000); !deadline.hasExpired();) {
        m_socketPath = findSocket(id);
        if (!m_socketPath.isEmpty()) {
            // "zantro-sim: serving COPY on SOCKET": the copy to remove should the process be killed.
            QByteArray said = m_process.readAll();
            while (use == Image::FreshCopy && !said.contains('\n') && m_process.waitForReadyRead(1000))
                said += m_process.readAll();
            const QString line = QString::fromLocal8Bit(said);
            const int from = line.indexOf(QLatin1String("serving ")), to = line.indexOf(QLatin1String(" on "));
            if (use == Image::FreshCopy && from >= 0 && to > from)
                m_servedCopy = line.mid(from + 8, to - from - 8);
            return true;
        }
        // Doubles as the pause between probes and notices an early exit.
        if (m_process.waitForFinished(20) || m_process.state() == QProcess::NotRunning) {
            m_error = QStringLiteral("zantro-sim ended: ") + QString::fromLocal8Bit(m_process.readAll());
            return false;
        }
    }
    m_error = QStringLiteral("zantro-sim did not answer in time: ") + QString::fromLocal8Bit(m_process.readAll());
    stop();
    return false;
}

QString SimulatorProcess::findSocket(const QString& id) const
{
    const QDir folder(m_socketDirectory);
    for (const QString& name : folder.entryList(QDir::System | QDir::Files | QDir::Hidden | QDir::NoDotAndDotDot)) {
        DeviceConnection probe(folder.filePath(name));
        if (probe.startHandshake() && probe.finishHandshake(QDeadlineTimer(200)) == 0 && probe.deviceId() == id)
            return probe.socketPath();
    }
    return QString();
}

QSharedPointer<_ZantDevice> SimulatorProcess::connectDevice(const QString& image, const QString& id,
                                                          const QStringList& extraArguments, Image use)
{
    if (!start(image, id, extraArguments, use)) {
        qWarning("%s", qPrintable(m_error));
        return {};
    }
    QList<QPair<QString, QString>> devices;
    Portlex::GetDevices(devices);
    QSharedPointer<_ZantDevice> device = Portlex::GetDevice(id);
    QString reason;
    if (device && Portlex::ConnectDevice(device, QString(), QString(), nullptr, &reason))
        return device;
    qWarning("connecting %s failed: %s", qPrintable(id), qPrintable(reason));
    return {};
}

bool SimulatorProcess::stop()
{
    if (!isRunning())
        return true;
    sendSignal(SIGTERM);
    const bool clean = m_process.waitForFinished(10000) && m_process.exitStatus() == QProcess::NormalExit;
    if (isRunning()) {
        m_process.kill();
        m_process.waitForFinished();
    }
    removeServedCopy();
    return clean;
}

void SimulatorProcess::kill()
{
    sendSignal(SIGKILL);
    m_process.waitForFinished();
    removeServedCopy();
}

// A clean exit removes the copy itself; a killed simulator leaves it behind.
void SimulatorProcess::removeServedCopy()
{
    if (isRunning())
        return;
    if (!m_servedCopy.isEmpty())
        QDir(m_servedCopy).removeRecursively();
    m_servedCopy.clear();
}

void SimulatorProcess::pause() { sendSignal(SIGSTOP); }

void SimulatorProcess::resume() { sendSignal(SIGCONT); }

void SimulatorProcess::sendSignal(int number)
{
    if (isRunning())
        ::kill(pid_t(m_process.processId()), number);
}
