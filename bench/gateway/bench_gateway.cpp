// Gateway speed figures: the round trip of a small query next to a raw Unix-socket
// ping-pong of the same sizes measured in the same run, GetModules of 10,000 modules and
// GetFileSystemLevel of a folder of 10,000 files.
//
//   bench_gateway [IMAGE]
//
// IMAGE is an image made by `zantro-sim generate IMAGE --modules 10000 --classes 2000
// --files 10000 --processes 50`; without it one is generated in a temporary folder.

#include "Portlex.h"
#include "SimulatorProcess.h"

#include <QCoreApplication>
#include <QDir>
#include <QElapsedTimer>
#include <QProcess>
#include <QTemporaryDir>

#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <thread>
#include <vector>

namespace {

constexpr int RoundTrips = 5000;
constexpr int LargeRuns = 20;
constexpr int Items = 10000;

struct Figures
{
    double median = 0;
    double p99 = 0;
};

Figures summarize(std::vector<qint64> nanoseconds)
{
    std::sort(nanoseconds.begin(), nanoseconds.end());
    Figures figures;
    figures.median = nanoseconds[nanoseconds.size() / 2] / 1000.0;
    figures.p99 = nanoseconds[std::min(nanoseconds.size() - 1, nanoseconds.size() * 99 / 100)] / 1000.0;
    return figures;
}

template <typename F>
Figures measure(int runs, F work)
{
    std::vector<qint64> times;
    times.reserve(runs);
    QElapsedTimer timer;
    for (int i = 0; i < runs; ++i) {
        timer.start();
        work();
        times.push_back(timer.nsecsElapsed());
    }
    return summarize(times);
}

bool transfer(int fd, char* bytes, size_t size, bool reading)
{
    while (size > 0) {
        const ssize_t done = reading ? ::read(fd, bytes, size) : ::write(fd, bytes, size);
        if (done <= 0)
            return false;
        bytes += done;
        size -= size_t(done);
    }
    return true;
}

// Blocking read/write over a socket pair to a thread that answers every request.
Figures rawPingPong(size_t requestSize, size_t answerSize)
{
    int fds[2];
    if (::socketpair(AF_UNIX, SOCK_STREAM, 0, fds) != 0)
        qFatal("socketpair failed");
    std::thread echo([&] {
        std::vector<char> request(requestSize), answer(answerSize, 'a');
        while (transfer(fds[1], request.data(), requestSize, true) && transfer(fds[1], answer.data(), answerSize, false)) {
        }
    });
    std::vector<char> request(requestSize, 'r'), answer(answerSize);
    const Figures figures = measure(RoundTrips, [&] {
        transfer(fds[0], request.data(), requestSize, false);
        transfer(fds[0], answer.data(), answerSize, true);
    });
    ::close(fds[0]);
    echo.join();
    ::close(fds[1]);
    return figures;
}

QString generateImage(const QString& folder)
{
    const QString image = folder + QStringLiteral("/image");
    std::printf("generating a 10,000 module / 10,000 file image in %s ...\n", qPrintable(image));
    std::fflush(stdout);
    const int status = QProcess::execute(SimulatorProcess::executable(),
                                         { QStringLiteral("generate"), image, QStringLiteral("--modules"), QString::number(Items),
                                           QStringLiteral("--classes"), QStringLiteral("2000"), QStringLiteral("--files"),
                                           QString::number(Items), QStringLiteral("--processes"), QStringLiteral("50") });
    if (status != 0)
        qFatal("zantro-sim generate failed");
    return image;
}

// The folder of the first volume that holds the most files, found level by level.
QString largestFolder(_ZantDevice& device, const QString& root)
{
    QString best = root;
    int bestCount = -1;
    QStringList pending { root };
    while (!pending.isEmpty()) {
        QSharedPointer<_DirectoryInfo> level;
        if (device.GetFileSystemLevel(pending.takeFirst(), level, nullptr, nullptr) != 0)
            continue;
        if (level->files.size() > bestCount) {
            bestCount = int(level->files.size());
            best = level->Path();
        }
        for (const auto& directory : level->directories)
            pending << directory->Path();
    }
    return best;
}

} // namespace

int main(int argc, char** argv)
{
    QCoreApplication app(argc, argv);
    QTemporaryDir work;
    const QString sockets = work.filePath(QStringLiteral("sockets"));
    QDir().mkpath(sockets);
    qputenv("ZANTRO_SIM_DIR", QFile::encodeName(sockets));
    const QString image = argc > 1 ? QString::fromLocal8Bit(argv[1]) : generateImage(work.path());

    SimulatorProcess simulator(sockets);
    if (!simulator.start(image, QStringLiteral("bench"), QStringList(), SimulatorProcess::Image::InPlace))
        qFatal("%s", qPrintable(simulator.errorString()));
    Portlex::Initialize();
    QList<QPair<QString, QString>> devices;
    Portlex::GetDevices(devices);
    const QSharedPointer<_ZantDevice> device = Portlex::GetDevice(QStringLiteral("bench"));
    QString reason;
    if (!device || !Portlex::ConnectDevice(device, QString(), QString(), nullptr, &reason))
        qFatal("cannot connect: %s", qPrintable(reason));

    QString mode, owner, expiry;
    device->TepStatus(mode, owner, expiry);
    const size_t requestSize = Protocol::HeaderSize;
    const size_t answerSize = Protocol::HeaderSize + 2 * sizeof(qint32) + 3 * sizeof(quint32)
        + 2 * size_t(mode.size() + owner.size() + expiry.size());
    const Figures raw = rawPingPong(requestSize, answerSize);
    const Figures query = measure(RoundTrips, [&] { device->TepStatus(mode, owner, expiry); });
    std::printf("round trip (TepStatus, %zu/%zu bytes): median %.1f us, p99 %.1f us\n", requestSize, answerSize,
                query.median, query.p99);
    std::printf("raw Unix-socket ping-pong, same sizes: median %.1f us, p99 %.1f us\n", raw.median, raw.p99);
    std::printf("ratio: median %.2fx, p99 %.2fx (target: at most 2x)\n", query.median / raw.median, query.p99 / raw.p99);

    QVector<ModuleInfo> modules;
    const Figures listing = measure(LargeRuns, [&] { device->GetModules(modules, nullptr, nullptr); });
    std::printf("GetModules (%lld modules): median %.2f ms, p99 %.2f ms (target: under 30 ms)\n",
                static_cast<long long>(modules.size()), listing.median / 1000, listing.p99 / 1000);

    QSet<VolumeInfo> volumes;
    device->GetVolumes(volumes);
    const QString folder = largestFolder(*device, volumes.isEmpty() ? QStringLiteral("/") : volumes.cbegin()->mountPoint);
    QSharedPointer<_DirectoryInfo> level;
    const Figures fetch = measure(LargeRuns, [&] { device->GetFileSystemLevel(folder, level, nullptr, nullptr); });
    std::printf("GetFileSystemLevel (%s, %lld files): median %.2f ms, p99 %.2f ms\n", qPrintable(folder),
                static_cast<long long>(level ? level->files.size() : 0), fetch.median / 1000, fetch.p99 / 1000);

    Portlex::Destroy();
    return 0;
}
