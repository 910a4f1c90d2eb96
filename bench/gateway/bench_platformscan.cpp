// The platform scan of 5,000 MIF files next to reading the same files' bytes with
// QFile::readAll, measured in the same run on a warm cache. Prints figures only.
//
//   bench_platformscan [PLATFORM]
//
// PLATFORM is a folder made by `zantro-sim platform PLATFORM --mifs 5000`; without it one
// is generated in a temporary folder.

#include "MifFileFinder.h"
#include "PlatformGenerator.h"
#include "Portlex.h"

#include <QCoreApplication>
#include <QElapsedTimer>
#include <QFile>
#include <QTemporaryDir>
#include <QThread>

#include <algorithm>
#include <cstdio>
#include <functional>

namespace {

constexpr int MifCount = 5000;
constexpr int Rounds = 7;

double elapsedMs(const std::function<void()>& pass)
{
    QElapsedTimer timer;
    timer.start();
    pass();
    return timer.nsecsElapsed() / 1e6;
}

qint64 readAll(const QStringList& paths)
{
    qint64 bytes = 0;
    for (const QString& path : paths) {
        QFile file(path);
        if (file.open(QIODevice::ReadOnly))
            bytes += file.readAll().size();
    }
    return bytes;
}

} // namespace

int main(int argc, char* argv[])
{
    QCoreApplication app(argc, argv);
    QTemporaryDir temporary;
    QString platform = app.arguments().value(1);
    if (platform.isEmpty()) {
        platform = temporary.filePath(QStringLiteral("platform"));
        PlatformGenerator generator;
        if (!generator.generate(platform, MifCount, PlatformGenerator::classDatabaseIds(app.applicationDirPath()))) {
            std::fprintf(stderr, "bench_platformscan: %s\n", qPrintable(generator.errorString()));
            return 1;
        }
    }

    const QStringList paths = MifFileFinder::find(platform);
    qint64 bytes = readAll(paths); // warms the cache for both
    std::vector<MifEntry> entries;
    int found = 0;

    // The passes take turns, so that a busy machine slows them alike; the best round counts.
    double listMs = 1e300;
    double readMs = 1e300;
    double scanMs = 1e300;
    for (int round = 0; round < Rounds; ++round) {
        listMs = std::min(listMs, elapsedMs([&] { MifFileFinder::find(platform); }));
        readMs = std::min(readMs, elapsedMs([&] { bytes = readAll(paths); }));
        scanMs = std::min(scanMs, elapsedMs([&] { found = Portlex::GetPlatformClassIds(platform, entries, nullptr, nullptr); }));
    }
    // Listing the files is part of the scan, so it is also shown added to the raw read.
    const double ratio = readMs / scanMs;
    const double ratioWithListing = (readMs + listMs) / scanMs;

    std::printf("platform scan: %lld MIF files, %lld bytes, %d modules read, %d threads\n",
                static_cast<long long>(paths.size()), static_cast<long long>(bytes), found,
                QThread::idealThreadCount());
    std::printf("  listing the MIF files      %9.1f ms\n", listMs);
    std::printf("  QFile::readAll of each     %9.1f ms\n", readMs);
    std::printf("  GetPlatformClassIds        %9.1f ms\n", scanMs);
    std::printf("  scan speed / raw read      %9.2fx (target >= 0.80x) %s\n", ratio, ratio >= 0.8 ? "met" : "MISSED");
    std::printf("  scan speed / listing+read  %9.2fx\n", ratioWithListing);
    return 0;
}
