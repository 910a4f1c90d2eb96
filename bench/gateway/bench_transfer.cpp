// File transfer speed: a 256 MiB copy to the device and back through the gateway, next to
// a plain local copy of the same bytes (QFile::copy), the same copy synced to disk (as the
// PC side's save file is on commit) and a raw stream of the file from a second process
// over a Unix socket pair into a new file (the wire's limit), all measured in the same
// run, in a folder of the home folder's file system (never tmpfs, unless home is).
// Peak memory (VmHWM) of both processes follows.
//
//   bench_transfer [MiB]

#include "Portlex.h"
#include "SimulatorProcess.h"

#include <QCoreApplication>
#include <QDir>
#include <QElapsedTimer>
#include <QRandomGenerator>
#include <QTemporaryDir>

#include <linux/magic.h>
#include <sys/socket.h>
#include <sys/statfs.h>
#include <sys/wait.h>
#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <functional>
#include <cstdio>
#include <vector>

namespace {

constexpr int Runs = 5;

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

// The file streamed by a child process through a socket pair into target, 1 MiB at a time.
bool rawStream(const QString& source, const QString& target)
{
    int pair[2];
    if (::socketpair(AF_UNIX, SOCK_STREAM, 0, pair) != 0)
        return false;
    const int buffer = 4 << 20;
    for (int end : pair) {
        ::setsockopt(end, SOL_SOCKET, SO_SNDBUF, &buffer, sizeof buffer);
        ::setsockopt(end, SOL_SOCKET, SO_RCVBUF, &buffer, sizeof buffer);
    }
    const QByteArray sourcePath = QFile::encodeName(source);
    const pid_t child = ::fork();
    if (child == 0) {
        ::close(pair[0]);
        const int in = ::open(sourcePath.constData(), O_RDONLY);
        std::vector<char> block(1 << 20);
        ssize_t got = -1;
        while (in >= 0 && (got = ::read(in, block.data(), block.size())) > 0) {
            for (ssize_t sent = 0; sent < got;) {
                const ssize_t n = ::write(pair[1], block.data() + sent, size_t(got - sent));
                if (n <= 0)
                    ::_exit(1);
                sent += n;
            }
        }
        ::_exit(in >= 0 && got == 0 ? 0 : 1);
    }
    ::close(pair[1]);
    QFile out(target);
    bool ok = child > 0 && out.open(QIODevice::WriteOnly | QIODevice::Truncate);
    std::vector<char> block(1 << 20);
    ssize_t got;
    while (ok && (got = ::read(pair[0], block.data(), block.size())) > 0)
        ok = out.write(block.data(), got) == got;
    ::close(pair[0]);
    int status = 0;
    return ::waitpid(child, &status, 0) == child && ok && WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

bool syncFile(const QString& path)
{
    const int descriptor = ::open(QFile::encodeName(path).constData(), O_RDONLY);
    const bool synced = descriptor >= 0 && ::fsync(descriptor) == 0;
    if (descriptor >= 0)
        ::close(descriptor);
    return synced;
}

// Peak resident memory of a process, in MiB, from /proc; -1 if unknown.
double peakMiB(qint64 pid)
{
    QFile status(QStringLiteral("/proc/%1/status").arg(pid));
    if (!status.open(QIODevice::ReadOnly))
        return -1;
    for (const QByteArray& line : status.readAll().split('\n')) {
        if (line.startsWith("VmHWM:"))
            return line.mid(6).trimmed().split(' ').value(0).toDouble() / 1024;
    }
    return -1;
}

// Seconds each way of copying takes, median of Runs rounds. Every copy starts from the
// same clean state: its target removed and no dirty pages left by the copy before (so the
// page cache's write-back does not bill one way for another's writes). The ways take turns,
// and each round starts with the next way, so that none is always first after a sync.
// Empty if a copy failed.
std::vector<double> medians(const std::vector<std::function<bool()>>& ways, const std::function<void()>& clean)
{
    std::vector<std::vector<double>> seconds(ways.size());
    for (int round = 0; round < Runs; ++round) {
        for (size_t turn = 0; turn < ways.size(); ++turn) {
            const size_t i = (turn + size_t(round)) % ways.size();
            clean();
            ::sync();
            QElapsedTimer timer;
            timer.start();
            if (!ways[i]())
                return {};
            seconds[i].push_back(timer.nsecsElapsed() / 1e9);
        }
    }
    std::vector<double> result;
    for (std::vector<double>& times : seconds) {
        std::sort(times.begin(), times.end());
        result.push_back(times[times.size() / 2]);
    }
    return result;
}

} // namespace

int main(int argc, char* argv[])
{
    QCoreApplication app(argc, argv);
    const qint64 mebibytes = argc > 1 ? QByteArray(argv[1]).toLongLong() : 256;
    const qint64 size = mebibytes << 20;

    // On the disk of the user's home folder, as a user's copies are: /tmp may be tmpfs.
    QTemporaryDir work(QDir::home().filePath(QStringLiteral(".bench_transfer-XXXXXX")));
    const QDir dir(work.path());
    if (!dir.mkpath(QStringLiteral("image/flash/user")) || !dir.mkpath(QStringLiteral("sockets"))
        || !writeFile(dir.filePath(QStringLiteral("image/device.xml")), Profile)
        || !writeRandomFile(dir.filePath(QStringLiteral("source.bin")), size)) {
        std::fprintf(stderr, "cannot prepare %s\n", qPrintable(work.path()));
        return 1;
    }
    struct statfs fs;
    const bool tmpfs = ::statfs(QFile::encodeName(work.path()).constData(), &fs) == 0 && fs.f_type == TMPFS_MAGIC;
    // The socket folder stays short and off the disk: only the bytes go to the home folder.
    QTemporaryDir sockets;
    qputenv("ZANTRO_SIM_DIR", QFile::encodeName(sockets.path()));
    SimulatorProcess simulator(sockets.path());
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
    const QString target = dir.filePath(QStringLiteral("target.bin"));
    const QString onDevice = QStringLiteral("/user/big.bin");
    // The copy to the PC reads a device file of its own, so that removing the device
    // copy's target never takes it away.
    if (device->CopyFileToDevice(source, QStringLiteral("/user/kept.bin")) != 0) {
        std::fprintf(stderr, "cannot place the device's file\n");
        return 1;
    }
    const std::vector<double> times = medians(
        {
            [&] { return QFile::copy(source, target); },
            [&] { return QFile::copy(source, target) && syncFile(target); },
            [&] { return rawStream(source, target); },
            [&] { return device->CopyFileToDevice(source, onDevice) == 0; },
            [&] { return device->CopyFileToPC(QStringLiteral("/user/kept.bin"), target) == 0; },
        },
        [&] {
            QFile::remove(target);
            device->DeleteDeviceFile(onDevice);
        });
    if (times.empty()) {
        std::fprintf(stderr, "a copy failed\n");
        return 1;
    }

    const auto rate = [mebibytes](double seconds) { return mebibytes / seconds; };
    std::printf("copy of %lld MiB in %s (%s), median of %d runs, ways in turn from a synced state\n",
                static_cast<long long>(mebibytes), qPrintable(QDir::homePath()), tmpfs ? "tmpfs" : "not tmpfs", Runs);
    const double plain = times[0];
    const double synced = times[1];
    const auto row = [&](const char* name, double seconds) {
        std::printf("  %-34s %8.1f MiB/s   %.2fx the plain copy   %.2fx the plain copy + fsync\n", name, rate(seconds),
                    plain / seconds, synced / seconds);
    };
    row("plain local copy (QFile::copy)", plain);
    row("plain local copy + fsync", synced);
    row("raw socket stream, two processes", times[2]);
    row("CopyFileToDevice", times[3]);
    row("CopyFileToPC (synced, renamed)", times[4]);
    std::printf("  target: both gateway copies >= 0.90x the plain copy + fsync\n");
    std::printf("  peak memory: bench (client) %.1f MiB, simulator %.1f MiB\n", peakMiB(QCoreApplication::applicationPid()),
                peakMiB(simulator.processId()));
    Portlex::Destroy();
    return 0;
}
