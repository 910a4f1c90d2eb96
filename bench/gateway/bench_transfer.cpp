// File transfer speed: a 256 MiB copy to the device and back through the gateway, next to
// a plain local copy of the same bytes (QFile::copy), the same copy synced to disk (as the
// PC side's save file is on commit) and a raw stream of the file from a second process
// over a Unix socket pair into a new file (the wire's limit), all measured in the same
// run. Peak memory (VmHWM) of both processes follows.
//
//   bench_transfer [MiB]

#include "Portlex.h"
#include "SimulatorProcess.h"

#include <QCoreApplication>
#include <QDir>
#include <QElapsedTimer>
#include <QRandomGenerator>
#include <QTemporaryDir>

#include <sys/socket.h>
#include <sys/wait.h>
#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <functional>
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

// Seconds each way of copying takes, median of Runs rounds; the ways take turns within a
// round, and each starts with no dirty pages left by the one before, so that the page
// cache's write-back does not bill one way for another's writes. Empty if a copy failed.
std::vector<double> medians(const std::vector<std::function<bool()>>& ways)
{
    std::vector<std::vector<double>> seconds(ways.size());
    for (int round = 0; round < Runs; ++round) {
        for (size_t i = 0; i < ways.size(); ++i) {
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
    const std::vector<double> times = medians({
        [&] { QFile::remove(plainTarget); return QFile::copy(source, plainTarget); },
        [&] { QFile::remove(plainTarget); return QFile::copy(source, plainTarget) && syncFile(plainTarget); },
        [&] { return rawStream(source, plainTarget); },
        [&] { return device->CopyFileToDevice(source, QStringLiteral("/user/big.bin")) == 0; },
        [&] { return device->CopyFileToPC(QStringLiteral("/user/big.bin"), back) == 0; },
    });
    if (times.empty()) {
        std::fprintf(stderr, "a copy failed\n");
        return 1;
    }

    const auto rate = [mebibytes](double seconds) { return mebibytes / seconds; };
    std::printf("copy of %lld MiB, median of %d runs\n", static_cast<long long>(mebibytes), Runs);
    const double plain = times[0];
    const double raw = times[1];
    const auto row = [&](const char* name, double seconds) {
        std::printf("  %-34s %8.1f MiB/s   %.2fx the plain copy   %.2fx the raw stream\n", name, rate(seconds),
                    plain / seconds, raw / seconds);
    };
    row("plain local copy (QFile::copy)", plain);
    row("raw socket stream, two processes", raw);
    row("plain local copy + fsync", times[2]);
    row("CopyFileToDevice", times[3]);
    row("CopyFileToPC (save file)", times[4]);
    std::printf("  target: both copies >= 0.70x the plain copy\n");
    std::printf("  peak memory: bench (client) %.1f MiB, simulator %.1f MiB\n", peakMiB(QCoreApplication::applicationPid()),
                peakMiB(simulator.processId()));
    Portlex::Destroy();
    return 0;
}
