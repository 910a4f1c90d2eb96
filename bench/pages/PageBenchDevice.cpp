#include "PageBenchDevice.h"

#include "Portlex.h"

#include <QCoreApplication>
#include <QElapsedTimer>
#include <QFile>
#include <QProcess>
#include <QTemporaryDir>
#include <QThread>

#include <sys/resource.h>

#include <cstdio>

namespace PageBenchDevice {

void useOffscreenAndWorkSettings(const QTemporaryDir& work)
{
    if (qEnvironmentVariableIsEmpty("QT_QPA_PLATFORM"))
        qputenv("QT_QPA_PLATFORM", "offscreen");
    qputenv("XDG_CONFIG_HOME", QFile::encodeName(work.filePath(QStringLiteral("config"))));
}

void startSimulator(QProcess& server, const QString& image, const QString& sockets, const QString& id)
{
    qputenv("ZANTRO_SIM_DIR", QFile::encodeName(sockets));
    server.start(simulatorPath(), {QStringLiteral("--image"), image, QStringLiteral("--id"), id,
                                   QStringLiteral("--socket-dir"), sockets});
    Portlex::Initialize();
}

QString simulatorPath()
{
    return QCoreApplication::applicationDirPath() + QStringLiteral("/zantro-sim");
}

bool generateImage(const QString& image, int modules, int classes, int settings, int files)
{
    QStringList arguments = {QStringLiteral("generate"), image, QStringLiteral("--modules"), QString::number(modules),
                             QStringLiteral("--classes"), QString::number(classes), QStringLiteral("--files"),
                             QString::number(files), QStringLiteral("--processes"), QStringLiteral("0")};
    if (settings > 0)
        arguments << QStringLiteral("--settings") << QString::number(settings);
    return QProcess::execute(simulatorPath(), arguments) == 0;
}

QSharedPointer<_ZantDevice> connectDevice(const QString& id)
{
    QElapsedTimer waited;
    waited.start();
    while (waited.elapsed() < 120000) {
        QList<QPair<QString, QString>> devices;
        Portlex::GetDevices(devices);
        const QSharedPointer<_ZantDevice> device = Portlex::GetDevice(id);
        if (device)
            return Portlex::ConnectDevice(device, QString(), QString()) ? device : nullptr;
        QThread::msleep(100);
    }
    return nullptr;
}

QSharedPointer<_ZantDevice> serveGeneratedDevice(QProcess& server, const QTemporaryDir& work, int modules, int classes,
                                                 int settings, const QString& id, int files)
{
    const QString image = imagePath(work, id);
    if (!work.isValid() || !generateImage(image, modules, classes, settings, files)) {
        std::fprintf(stderr, "cannot generate the image with %s\n", qPrintable(simulatorPath()));
        return {};
    }
    startSimulator(server, image, work.filePath(QStringLiteral("sockets")), id);
    const QSharedPointer<_ZantDevice> device = connectDevice(id);
    if (!device)
        std::fprintf(stderr, "the simulator did not answer: %s\n", qPrintable(QString::fromLocal8Bit(server.readAll())));
    return device;
}

QString imagePath(const QTemporaryDir& work, const QString& id)
{
    return work.filePath(QStringLiteral("image-") + id);
}

long peakMemoryMb()
{
    rusage usage {};
    getrusage(RUSAGE_SELF, &usage);
    return usage.ru_maxrss / 1024; // kB on Linux
}

} // namespace PageBenchDevice
