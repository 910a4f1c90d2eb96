#pragma once

#include <QSharedPointer>
#include <QString>

class _ZantDevice;

// What both page benchmarks need around the pages: a generated image, the device that a
// simulator serves from it, and the process's peak memory.
namespace PageBenchDevice {

const QString DeviceId = QStringLiteral("bench");

QString simulatorPath();
bool generateImage(const QString& image, int modules, int classes);
// Waits (up to two minutes, while a large image loads) for the simulator and connects it.
QSharedPointer<_ZantDevice> connectDevice(const QString& id = DeviceId);
long peakMemoryMb();

} // namespace PageBenchDevice
