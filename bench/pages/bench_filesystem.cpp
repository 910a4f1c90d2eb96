// The device file system page and its drive watcher, with figures printed:
// 1. a generated volume (50,000 files in 5,000 folders unless told otherwise) served by a
//    real simulator: the time from showing the page until the first "usermod" level is in
//    the tree and until the whole tree is in, and the longest gap of a 5 ms heartbeat on the
//    GUI thread meanwhile;
// 2. a drop copy of one large local file (1024 MiB unless told otherwise) onto the device:
//    its throughput against a plain local copy of the same file, the longest GUI gap and
//    how often its progress reached the GUI thread;
// 3. the watcher on a local tree of 20,000 folders: time to set up, memory, stop latency.
//
// bench_filesystem [--files N] [--folders N] [--drop-mib N] [--watch-folders N]

#include "DeviceFileSystemView.h"
#include "DeviceWindow.h"
#include "FileTransferThread.h"
#include "PageBenchDevice.h"
#include "Portlex.h"
#include "WinVolumeMonitor.h"

#include <QApplication>
#include <QCommandLineParser>
#include <QDir>
#include <QElapsedTimer>
#include <QEventLoop>
#include <QFile>
#include <QProcess>
#include <QRandomGenerator>
#include <QTemporaryDir>
#include <QTextStream>
#include <QTimer>
#include <QTreeWidgetItemIterator>

#include <cstdio>
#include <functional>

using namespace PageBenchDevice;

namespace {

QTextStream& out()
{
    static QTextStream stream(stdout);
    return stream;
}

// The resident memory of the process now, in kB.
long residentKb()
{
    QFile status(QStringLiteral("/proc/self/status"));
    if (!status.open(QIODevice::ReadOnly))
        return 0;
    for (const QByteArray& line : status.readAll().split('\n')) {
        if (line.startsWith("VmRSS:"))
            return line.mid(6).trimmed().split(' ').first().toLong();
    }
    return 0;
}

// Runs the event loop with a 5 ms heartbeat until done() holds; the longest gap between
// two beats goes to gap. Returns the time taken.
qint64 runUntil(const std::function<bool()>& done, qint64& gap, const std::function<void(qint64)>& onBeat = {})
{
    QElapsedTimer since;
    QElapsedTimer sinceBeat;
    since.start();
    sinceBeat.start();
    QEventLoop loop;
    QTimer heartbeat;
    heartbeat.setTimerType(Qt::PreciseTimer);
    QObject::connect(&heartbeat, &QTimer::timeout, [&] {
        gap = std::max(gap, sinceBeat.restart());
        if (onBeat)
            onBeat(since.elapsed());
        if (done())
            loop.quit();
    });
    heartbeat.start(5);
    loop.exec();
    return since.elapsed();
}

// Counts the queued calls an object receives.
class ProgressCounter : public QObject
{
public:
    int calls = 0;

protected:
    bool eventFilter(QObject*, QEvent* event) override
    {
        if (event->type() == QEvent::MetaCall)
            ++calls;
        return false;
    }
};

QTreeWidgetItem* findItem(QTreeWidget* tree, const QString& path)
{
    for (int i = 0; i < tree->topLevelItemCount(); ++i) {
        if (tree->topLevelItem(i)->data(0, Qt::UserRole).toString() == path)
            return tree->topLevelItem(i);
    }
    return nullptr;
}

int itemCount(QTreeWidget* tree)
{
    int count = 0;
    for (QTreeWidgetItemIterator it(tree); *it; ++it)
        ++count;
    return count;
}

void crawl(DeviceWindow& window)
{
    out() << QStringLiteral("crawl:\n");
    window.actionDevice_File_System->trigger();
    DeviceFileSystemView* page = window._deviceFSView;
    qint64 firstUsermod = -1;
    qint64 gap = 0;
    // Every graft inserts rows; the last insertion is when the whole tree was in.
    QElapsedTimer since;
    since.start();
    qint64 lastInsert = 0;
    QObject::connect(page->_fsTree->model(), &QAbstractItemModel::rowsInserted, [&] { lastInsert = since.elapsed(); });
    bool crawled = false;
    runUntil(
        [&] {
            // Once the crawler is done, two empty ticks in a row mean that nothing is pending.
            crawled = crawled || (lastInsert > 0 && page->status() == QLatin1String("Ready"));
            return crawled && page->pacer().lastArmed() >= 200;
        },
        gap,
        [&](qint64 now) {
            const QTreeWidgetItem* usermod = firstUsermod < 0 ? findItem(page->_fsTree, QStringLiteral("/usermod")) : nullptr;
            if (usermod && usermod->childCount() > 0)
                firstUsermod = now;
        });
    out() << QStringLiteral("  first \"usermod\" level shown after %1 ms\n").arg(firstUsermod);
    out() << QStringLiteral("  whole tree (%1 items) in after %2 ms\n").arg(itemCount(page->_fsTree)).arg(lastInsert);
    out() << QStringLiteral("  longest GUI gap: %1 ms (target < 33 ms)\n").arg(gap);
    out().flush();
}

void dropCopy(DeviceWindow& window, const QString& work, int mib)
{
    out() << QStringLiteral("drop copy of %1 MiB:\n").arg(mib);
    const QString source = work + QStringLiteral("/big.bin");
    {
        QFile file(source);
        if (!file.open(QIODevice::WriteOnly))
            return;
        QByteArray block(1024 * 1024, Qt::Uninitialized);
        QRandomGenerator generator(5);
        generator.fillRange(reinterpret_cast<quint32*>(block.data()), block.size() / 4);
        for (int i = 0; i < mib; ++i)
            file.write(block);
    }
    QElapsedTimer local;
    local.start();
    QFile::copy(source, work + QStringLiteral("/local-copy.bin"));
    const qint64 localMs = std::max<qint64>(1, local.elapsed());
    QFile::remove(work + QStringLiteral("/local-copy.bin"));

    DeviceFileSystemView* page = window._deviceFSView;
    bool finished = false;
    QObject::connect(page, &DeviceFileSystemView::transferFinished, [&finished] { finished = true; });
    qint64 gap = 0;
    // The copy's progress arrives as queued calls on the page.
    ProgressCounter counter;
    page->installEventFilter(&counter);
    QTimer::singleShot(0, page, [page, source] { page->copyDropToDevice(QStringLiteral("/"), {QUrl::fromLocalFile(source)}); });
    const qint64 deviceMs = std::max<qint64>(1, runUntil([&finished] { return finished; }, gap));
    page->removeEventFilter(&counter);
    out() << QStringLiteral("  plain local copy: %1 ms, %2 MB/s\n").arg(localMs).arg(mib * 1000.0 / localMs, 0, 'f', 1);
    out() << QStringLiteral("  drop copy to the device: %1 ms, %2 MB/s (%3 of the local copy's speed)\n")
                 .arg(deviceMs)
                 .arg(mib * 1000.0 / deviceMs, 0, 'f', 1)
                 .arg(double(localMs) / double(deviceMs), 0, 'f', 2);
    out() << QStringLiteral("  longest GUI gap: %1 ms (target < 33 ms)\n").arg(gap);
    out() << QStringLiteral("  progress updates reaching the GUI: %1, %2 per second (at most every %3 ms: <= %4 per second)\n")
                 .arg(counter.calls)
                 .arg(counter.calls * 1000.0 / deviceMs, 0, 'f', 1)
                 .arg(FileTransferThread::ProgressIntervalMs)
                 .arg(1000 / FileTransferThread::ProgressIntervalMs);
    out().flush();
}

void watcher(const QString& work, int folders)
{
    out() << QStringLiteral("watcher on %1 folders:\n").arg(folders);
    const QString root = work + QStringLiteral("/watched");
    const int perTop = 100;
    for (int i = 0; i < folders; ++i)
        QDir().mkpath(QStringLiteral("%1/t%2/f%3").arg(root).arg(i / perTop).arg(i % perTop));
    const int expected = folders + (folders + perTop - 1) / perTop + 1;
    qint64 longestStop = 0;
    constexpr int Rounds = 5;
    for (int round = 0; round < Rounds; ++round) {
        const long before = residentKb();
        WinVolumeMonitor monitor(root);
        QElapsedTimer setUp;
        setUp.start();
        monitor.start();
        while (monitor.watchedFolders() < std::min(expected, WinVolumeMonitor::MaxFolders))
            QThread::msleep(1);
        const qint64 setUpMs = setUp.elapsed();
        const long memory = residentKb() - before;
        QThread::msleep(200); // a quiet disk
        QElapsedTimer stopping;
        stopping.start();
        monitor.stop();
        monitor.wait();
        const qint64 stopMs = stopping.elapsed();
        longestStop = std::max(longestStop, stopMs);
        out() << QStringLiteral("  round %1: %2 folders watched after %3 ms, %4 kB more memory in the process, stopped in %5 ms\n")
                     .arg(round + 1)
                     .arg(monitor.watchedFolders())
                     .arg(setUpMs)
                     .arg(memory)
                     .arg(stopMs);
    }
    out() << QStringLiteral("  longest stop: %1 ms (target < 200 ms)\n").arg(longestStop);
    out().flush();
}

} // namespace

int main(int argc, char** argv)
{
    QTemporaryDir work;
    useOffscreenAndWorkSettings(work);
    // The page watches the home folder; here it is the work folder.
    qputenv("HOME", QFile::encodeName(work.filePath(QStringLiteral("home"))));
    QDir().mkpath(work.filePath(QStringLiteral("home")));
    QApplication app(argc, argv);
    QCommandLineParser options;
    options.addHelpOption();
    options.addOption({QStringLiteral("files"), QStringLiteral("files of the volume"), QStringLiteral("N"), QStringLiteral("50000")});
    options.addOption({QStringLiteral("folders"), QStringLiteral("folders holding them"), QStringLiteral("N"), QStringLiteral("5000")});
    options.addOption({QStringLiteral("drop-mib"), QStringLiteral("size of the dropped file"), QStringLiteral("MiB"), QStringLiteral("1024")});
    options.addOption({QStringLiteral("watch-folders"), QStringLiteral("folders below the watched root"), QStringLiteral("N"), QStringLiteral("20000")});
    options.process(app);

    const QString image = work.filePath(QStringLiteral("image"));
    const QString sockets = work.filePath(QStringLiteral("sockets"));
    const QStringList generate = {QStringLiteral("generate"), image, QStringLiteral("--modules"), QStringLiteral("100"),
                                  QStringLiteral("--classes"), QStringLiteral("100"), QStringLiteral("--processes"),
                                  QStringLiteral("0"), QStringLiteral("--files"), options.value(QStringLiteral("files")),
                                  QStringLiteral("--folders"), options.value(QStringLiteral("folders"))};
    if (!work.isValid() || QProcess::execute(simulatorPath(), generate) != 0) {
        std::fprintf(stderr, "cannot generate the image with %s\n", qPrintable(simulatorPath()));
        return 1;
    }
    QProcess server;
    startSimulator(server, image, sockets);
    if (!connectDevice()) {
        std::fprintf(stderr, "the simulator did not answer: %s\n", qPrintable(QString::fromLocal8Bit(server.readAll())));
        return 1;
    }
    out() << QStringLiteral("volume: %1 files in %2 folders of /shared/bulk, 100 modules in /usermod\n")
                 .arg(options.value(QStringLiteral("files")), options.value(QStringLiteral("folders")));
    {
        DeviceWindow window;
        window.setAttribute(Qt::WA_DeleteOnClose, false);
        window.setDevice(DeviceId);
        window.show();
        crawl(window);
        dropCopy(window, work.path(), options.value(QStringLiteral("drop-mib")).toInt());
    }
    Portlex::Destroy();
    server.terminate();
    server.waitForFinished();
    watcher(work.path(), options.value(QStringLiteral("watch-folders")).toInt());
    out() << QStringLiteral("peak memory: %1 MB\n").arg(peakMemoryMb());
    return 0;
}
