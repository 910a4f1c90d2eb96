// File transfer speed: a 256 MiB copy to the device and back through the gateway, next to
// a plain local copy of the same bytes (QFile::copy) measured in the same run.
//
//   bench_transfer [MiB]

#include "Portlex.h"
#include "SimulatorProcess.h"

#include <QCoreApplication>
#include <QDir>
#include <QElapsedTimer>
#include <QRandomGenerator>
#include <QTemporaryDir>

#include <algorithm>
#include <cstdio>
#include <vector>

namespace {

constexpr int Runs = 3;

const char* const Profile = R"(<device id="bench-transfer" name="Bench">
  <platform name="P"><class id="0x01011001" component="core"/></platform>
  <volume id="1" name="Flash" mount="/" folder="flash" size="68719476736" modules="usermod" install="usermod"/>
</device>
)";

bool writeFile(const QString& path, const QByteArray& bytes)
{
    QFile file(path);
    return file.open(QIODevice::WriteOnly) && file.write(bytes) == bytes.size();
}

bool writeRandomFile(const QString& path, qint64 size)
{
    QFile file(path);
    if (!file.open(QIODevice::WriteOnly))
        return false;
    QByteArray block(1 << 20, Qt::Uninitialized);
    QRandomGenerator random(42);
    for (qint64 written = 0; written < size; written += block.size()) {
        random.fillRange(reinterpret_cast<quint32*>(block.data()), block.size() / 4);
        if (file.write(block) != block.size())
            return false;
    }
    return true;
}

// The median of Runs runs of work, in seconds; negative if a run failed.
template <typename F>
double median(F work)
{
    std::vector<double> seconds;
    for (int i = 0; i < Runs; ++i) {
        QElapsedTimer timer;
        timer.start();
        if (!work())
            return -1;
        seconds.push_back(timer.nsecsElapsed() / 1e9);
    }
    std::sort(seconds.begin(), seconds.end());
    return seconds[seconds.size() / 2];
}

} // namespace

int main(int argc, char* argv[])
{
    QCoreApplication app(argc, argv);
    const qint64 mebibytes = argc > 1 ? QByteArray(argv[1]).toLongLong() : 256;
    const qint64 size = mebibytes << 20;

    QTemporaryDir work;
    const QDir dir(work.path());
    if (!dir.mkpath(QStringLiteral("image/flash/user")) || !dir.mkpath(QStringLiteral("sockets"))
        || !writeFile(dir.filePath(QStringLiteral("image/device.xml")), Profile)
        || !writeRandomFile(dir.filePath(QStringLiteral("source.bin")), size)) {
        std::fprintf(stderr, "cannot prepare %s\n", qPrintable(work.path()));
        return 1;
    }
    qputenv("ZANTRO_SIM_DIR", QFile::encodeName(dir.filePath(QStringLiteral("sockets"))));
    SimulatorProcess simulator(dir.filePath(QStringLiteral("sockets")));
    if (!simulator.start(dir.filePath(QStringLiteral("image")), QStringLiteral("bench-transfer"), QStringList(),
                         SimulatorProcess::Image::InPlace)) {
        std::fprintf(stderr, "%s\n", qPrintable(simulator.errorString()));
        return 1;
    }
    Portlex::Initialize();
    QList<QPair<QString, QString>> devices;
    Portlex::GetDevices(devices);
    const QSharedPointer<_ZantDevice> device = Portlex::GetDevice(QStringLiteral("bench-transfer"));
    if (!device || !Portlex::ConnectDevice(device, QString(), QString())) {
        std::fprintf(stderr, "cannot connect\n");
        return 1;
    }

    const QString source = dir.filePath(QStringLiteral("source.bin"));
    const QString plainTarget = dir.filePath(QStringLiteral("plain.bin"));
    const QString back = dir.filePath(QStringLiteral("back.bin"));
    const double plain = median([&] { QFile::remove(plainTarget); return QFile::copy(source, plainTarget); });
    const double toDevice = median([&] { return device->CopyFileToDevice(source, QStringLiteral("/user/big.bin")) == 0; });
    const double toPC = median([&] { return device->CopyFileToPC(QStringLiteral("/user/big.bin"), back) == 0; });
    if (plain < 0 || toDevice < 0 || toPC < 0) {
        std::fprintf(stderr, "a copy failed\n");
        return 1;
    }

    const auto rate = [mebibytes](double seconds) { return mebibytes / seconds; };
    std::printf("copy of %lld MiB, median of %d runs\n", static_cast<long long>(mebibytes), Runs);
    std::printf("  plain local copy (QFile::copy)  %8.1f MiB/s\n", rate(plain));
    std::printf("  CopyFileToDevice                %8.1f MiB/s   %.2fx the plain copy (target >= 0.80x)\n",
                rate(toDevice), plain / toDevice);
    std::printf("  CopyFileToPC                    %8.1f MiB/s   %.2fx the plain copy (target >= 0.80x)\n",
                rate(toPC), plain / toPC);
    Portlex::Destroy();
    return 0;
}
