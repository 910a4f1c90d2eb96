// The live pages on a generated device (500 processes of 20 threads and 30 loaded modules
// unless told otherwise) served by a real simulator, and prints:
// - for the threads and the loaded modules page on a device where 5% of the processes
//   change every second: the merges seen, the longest and the typical GUI-thread gap of a
//   5 ms heartbeat, and the longest tick (merge + aging pass);
// - for a device window showing the threads page of a device that does not change: the
//   CPU the program and the simulator use over a minute;
// - the cost of one poll of each list: the client's time and CPU, the simulator's CPU.
//
// bench_livepages [--processes N] [--threads N] [--loaded-modules N] [--churn PERCENT]
//                 [--seconds S] [--idle-seconds S]

#include "DeviceWindow.h"
#include "LivePollThread.h"
#include "LoadedModuleView.h"
#include "PageBenchDevice.h"
#include "Portlex.h"
#include "ProcessView.h"
#include "_ZantDevice.h"

#include <QApplication>
#include <QCommandLineParser>
#include <QElapsedTimer>
#include <QEventLoop>
#include <QFile>
#include <QProcess>
#include <QStandardPaths>
#include <QTemporaryDir>
#include <QTextStream>
#include <QTimer>

#include <algorithm>
#include <cstdio>
#include <ctime>
#include <functional>
#include <sys/resource.h>
#include <unistd.h>

using namespace PageBenchDevice;

namespace {

const QString StillId = QStringLiteral("still");

QTextStream& out()
{
    static QTextStream stream(stdout);
    return stream;
}

struct Shape
{
    int processes = 500;
    int threads = 20;
    int loadedModules = 30;
};

bool generate(const QString& image, const Shape& shape, int churn)
{
    const QStringList arguments = {QStringLiteral("generate"), image, QStringLiteral("--modules"), QStringLiteral("0"),
                                   QStringLiteral("--classes"), QStringLiteral("0"), QStringLiteral("--files"),
                                   QStringLiteral("0"), QStringLiteral("--processes"), QString::number(shape.processes),
                                   QStringLiteral("--threads"), QString::number(shape.threads),
                                   QStringLiteral("--loaded-modules"), QString::number(shape.loadedModules),
                                   QStringLiteral("--churn"), QString::number(churn)};
    return QProcess::execute(simulatorPath(), arguments) == 0;
}

double processCpuMs()
{
    rusage usage {};
    getrusage(RUSAGE_SELF, &usage);
    return (usage.ru_utime.tv_sec + usage.ru_stime.tv_sec) * 1000.0
        + (usage.ru_utime.tv_usec + usage.ru_stime.tv_usec) / 1000.0;
}

double threadCpuMs()
{
    timespec now {};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
    return now.tv_sec * 1000.0 + now.tv_nsec / 1e6;
}

// User and system time of another process, from /proc.
double otherCpuMs(qint64 pid)
{
    QFile stat(QStringLiteral("/proc/%1/stat").arg(pid));
    if (!stat.open(QIODevice::ReadOnly))
        return 0;
    const QByteArray text = stat.readAll();
    const QList<QByteArray> fields = text.mid(text.lastIndexOf(')') + 2).split(' ');
    // utime and stime are the 14th and 15th fields; the list starts at the 3rd.
    return (fields.value(11).toDouble() + fields.value(12).toDouble()) * 1000.0 / double(sysconf(_SC_CLK_TCK));
}

// A served device: the simulator process and the gateway's device.
class Served
{
public:
    Served(const QString& image, const QString& id, const QString& sockets)
    {
        m_server.start(simulatorPath(), {QStringLiteral("--image"), image, QStringLiteral("--id"), id,
                                         QStringLiteral("--socket-dir"), sockets});
        m_device = connectDevice(id);
    }
    ~Served()
    {
        m_device.reset();
        m_server.terminate();
        m_server.waitForFinished();
    }
    QSharedPointer<_ZantDevice> device() const { return m_device; }
    qint64 pid() const { return m_server.processId(); }

private:
    QProcess m_server;
    QSharedPointer<_ZantDevice> m_device;
};

void runFor(qint64 ms)
{
    QEventLoop loop;
    QTimer::singleShot(ms, &loop, &QEventLoop::quit);
    loop.exec();
}

// Runs page for seconds on a changing device and reports the gaps of the GUI thread.
void measureChurn(const QString& name, LiveTreePage* page, QTreeWidget* tree, int seconds)
{
    page->resize(900, 700);
    page->show();
    page->startComponent(DeviceId);
    QEventLoop ready;
    QObject::connect(page, &GatewayComponentWidget::stateChanged, &ready, [&] {
        if (page->state() == GatewayComponentWidget::Complete)
            ready.quit();
    });
    ready.exec();
    runFor(5000); // the first merge's rows have aged

    QVector<qint64> gaps;
    qint64 longestTick = 0;
    int merges = 0;
    QElapsedTimer sinceBeat;
    QTimer heartbeat;
    heartbeat.setTimerType(Qt::PreciseTimer);
    heartbeat.setInterval(5);
    QObject::connect(&heartbeat, &QTimer::timeout, [&] { gaps.append(sinceBeat.restart()); });
    // Connected after the page's own tick slot, so it runs right after it.
    QElapsedTimer tickClock;
    const auto connection = QObject::connect(&page->pacer(), &TickPacer::timeout, [&] {
        longestTick = std::max(longestTick, tickClock.restart());
    });
    QObject::connect(page, &GatewayComponentWidget::statusChanged, [&](const QString& status) {
        merges += status.startsWith(QLatin1String("Updating"));
    });
    // The tick's own time: from the heartbeat before it to its end is an upper bound; the
    // heartbeat restarts the clock.
    QObject::connect(&heartbeat, &QTimer::timeout, [&] { tickClock.restart(); });
    tickClock.start();
    sinceBeat.start();
    heartbeat.start();
    runFor(qint64(seconds) * 1000);
    heartbeat.stop();
    QObject::disconnect(connection);

    std::sort(gaps.begin(), gaps.end());
    const qint64 longest = gaps.isEmpty() ? 0 : gaps.last();
    const qint64 median = gaps.isEmpty() ? 0 : gaps.at(gaps.size() / 2);
    const qint64 p99 = gaps.isEmpty() ? 0 : gaps.at(gaps.size() * 99 / 100);
    int rows = 0;
    for (QTreeWidgetItemIterator it(tree); *it; ++it)
        ++rows;
    out() << name << QStringLiteral(": %1 rows, %2 list changes seen in %3 s, status \"%4\"\n")
                         .arg(rows).arg(merges).arg(seconds).arg(page->status());
    out() << QStringLiteral("  longest GUI gap: %1 ms (target < 16 ms); median %2 ms, 99th percentile %3 ms\n")
                 .arg(longest).arg(median).arg(p99);
    out() << QStringLiteral("  longest tick (merge + aging pass, with the heartbeat's slack): %1 ms\n").arg(longestTick);
    out().flush();
}

template <typename Record, typename Entry>
void measurePoll(const QString& name, const Served& served, const std::function<int(QVector<Record>&)>& poll,
                 QVector<Entry> Record::*entries)
{
    constexpr int Polls = 20;
    QVector<Record> first;
    poll(first);
    const double simBefore = otherCpuMs(served.pid());
    const double cpuBefore = threadCpuMs();
    QElapsedTimer clock;
    clock.start();
    QVector<Record> list;
    for (int i = 0; i < Polls; ++i) {
        list.clear();
        poll(list);
    }
    const double wallMs = double(clock.nsecsElapsed()) / 1e6 / Polls;
    const double clientMs = (threadCpuMs() - cpuBefore) / Polls;
    const double simMs = (otherCpuMs(served.pid()) - simBefore) / Polls;
    QElapsedTimer compare;
    compare.start();
    int same = 0;
    for (int i = 0; i < Polls; ++i)
        same += sameIds(first, list, entries);
    const double compareMs = double(compare.nsecsElapsed()) / 1e6 / Polls;
    qsizetype count = 0;
    for (const Record& record : std::as_const(list))
        count += (record.*entries).size();
    out() << name << QStringLiteral(": %1 processes, %2 entries; one poll takes %3 ms, client CPU %4 ms, "
                                    "simulator CPU %5 ms; the id comparison %6 ms (%7 of %8 alike)\n")
                         .arg(list.size()).arg(count).arg(wallMs, 0, 'f', 1).arg(clientMs, 0, 'f', 1)
                         .arg(simMs, 0, 'f', 1).arg(compareMs, 0, 'f', 2).arg(same).arg(Polls);
    out().flush();
}

} // namespace

int main(int argc, char** argv)
{
    if (qEnvironmentVariableIsEmpty("QT_QPA_PLATFORM"))
        qputenv("QT_QPA_PLATFORM", "offscreen");
    QStandardPaths::setTestModeEnabled(true);
    QApplication app(argc, argv);
    QCommandLineParser options;
    options.addHelpOption();
    options.addOption({QStringLiteral("processes"), QStringLiteral("processes of the image"), QStringLiteral("N"), QStringLiteral("500")});
    options.addOption({QStringLiteral("threads"), QStringLiteral("threads per process"), QStringLiteral("N"), QStringLiteral("20")});
    options.addOption({QStringLiteral("loaded-modules"), QStringLiteral("loaded modules per process"), QStringLiteral("N"), QStringLiteral("30")});
    options.addOption({QStringLiteral("churn"), QStringLiteral("percent of processes changing every second"), QStringLiteral("PERCENT"), QStringLiteral("5")});
    options.addOption({QStringLiteral("seconds"), QStringLiteral("seconds each page runs on the changing device"), QStringLiteral("S"), QStringLiteral("15")});
    options.addOption({QStringLiteral("idle-seconds"), QStringLiteral("seconds the window runs on the still device"), QStringLiteral("S"), QStringLiteral("60")});
    options.process(app);
    Shape shape;
    shape.processes = options.value(QStringLiteral("processes")).toInt();
    shape.threads = options.value(QStringLiteral("threads")).toInt();
    shape.loadedModules = options.value(QStringLiteral("loaded-modules")).toInt();
    const int churn = options.value(QStringLiteral("churn")).toInt();
    const int seconds = options.value(QStringLiteral("seconds")).toInt();
    const int idleSeconds = options.value(QStringLiteral("idle-seconds")).toInt();

    QTemporaryDir work;
    const QString changing = work.filePath(QStringLiteral("changing"));
    const QString still = work.filePath(QStringLiteral("still"));
    const QString sockets = work.filePath(QStringLiteral("sockets"));
    if (!work.isValid() || !generate(changing, shape, churn) || !generate(still, shape, 0)) {
        std::fprintf(stderr, "cannot generate the images with %s\n", qPrintable(simulatorPath()));
        return 1;
    }
    qputenv("ZANTRO_SIM_DIR", QFile::encodeName(sockets));
    Portlex::Initialize();
    out() << QStringLiteral("device: %1 processes of %2 threads and %3 loaded modules, %4% changing every second\n")
                 .arg(shape.processes).arg(shape.threads).arg(shape.loadedModules).arg(churn);

    {
        const Served served(changing, DeviceId, sockets);
        if (!served.device()) {
            std::fprintf(stderr, "the simulator did not answer\n");
            return 1;
        }
        {
            ProcessView page;
            measureChurn(QStringLiteral("threads page"), &page, page._processTree, seconds);
        }
        {
            LoadedModuleView page;
            measureChurn(QStringLiteral("loaded modules page"), &page, page._loadedModuleTree, seconds);
        }
        const QSharedPointer<_ZantDevice> device = served.device();
        measurePoll<ProcessInfo>(QStringLiteral("GetProcesses"), served,
                                 [&](QVector<ProcessInfo>& list) { return device->GetProcesses(list); },
                                 &ProcessInfo::threads);
        measurePoll<LoadedModuleInfo>(QStringLiteral("GetLoadedModules"), served,
                                      [&](QVector<LoadedModuleInfo>& list) { return device->GetLoadedModules(list); },
                                      &LoadedModuleInfo::modules);
    }
    {
        const Served served(still, StillId, sockets);
        if (!served.device()) {
            std::fprintf(stderr, "the simulator did not answer\n");
            return 1;
        }
        DeviceWindow window;
        window.setAttribute(Qt::WA_DeleteOnClose, false);
        window.setDevice(StillId);
        window.show();
        window._actionThreads->trigger();
        runFor(10000); // every page's first work is done, the tick has backed off
        const double cpuBefore = processCpuMs();
        const double simBefore = otherCpuMs(served.pid());
        runFor(qint64(idleSeconds) * 1000);
        const double wallMs = idleSeconds * 1000.0;
        out() << QStringLiteral("device window on the threads page, still device, %1 s: program CPU %2 ms (%3% of a core, "
                                "target < 1%), simulator CPU %4 ms (%5%), status \"%6\"\n")
                     .arg(idleSeconds)
                     .arg(processCpuMs() - cpuBefore, 0, 'f', 0)
                     .arg(100.0 * (processCpuMs() - cpuBefore) / wallMs, 0, 'f', 2)
                     .arg(otherCpuMs(served.pid()) - simBefore, 0, 'f', 0)
                     .arg(100.0 * (otherCpuMs(served.pid()) - simBefore) / wallMs, 0, 'f', 2)
                     .arg(window._processView->status());
        out().flush();
    }
    Portlex::Destroy();
    return 0;
}
