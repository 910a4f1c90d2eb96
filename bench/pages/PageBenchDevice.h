#pragma once

#include <QSharedPointer>
#include <QString>

class QProcess;
class QTemporaryDir;
class _ZantDevice;

// What both page benchmarks need around the pages: a generated image, the device that a
// simulator serves from it, and the process's peak memory.
namespace PageBenchDevice {

const QString DeviceId = QStringLiteral("bench");

// Before the application is made: the offscreen platform unless one is set, and the
// windows' settings in the work folder rather than the user's.
void useOffscreenAndWorkSettings(const QTemporaryDir& work);
QString simulatorPath();
// Serves image as device id on a socket in sockets, the folder the gateway then looks in.
void startSimulator(QProcess& server, const QString& image, const QString& sockets, const QString& id = DeviceId);
// settings: nodes of the settings store, 0 for the generator's default; files: that many files
// spread over folders of the first volume.
bool generateImage(const QString& image, int modules, int classes, int settings = 0, int files = 0);
// Waits (up to two minutes, while a large image loads) for the simulator and connects it.
QSharedPointer<_ZantDevice> connectDevice(const QString& id = DeviceId);
// Generates an image of that size in work (at imagePath), serves and connects it (the image
// loaded); null after saying why on stderr.
QSharedPointer<_ZantDevice> serveGeneratedDevice(QProcess& server, const QTemporaryDir& work, int modules, int classes,
                                                 int settings = 0, const QString& id = DeviceId, int files = 0);
QString imagePath(const QTemporaryDir& work, const QString& id = DeviceId);
long peakMemoryMb();

} // namespace PageBenchDevice
