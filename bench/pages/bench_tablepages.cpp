// The three table pages of a device window (module list, class ids, registry) on a generated
// image (10,000 modules, 20,000 classes, 20,000 registry entries unless told otherwise) served
// by a real simulator. For each page, median of three windows: the time from showing the page
// to "Ready", printed beside the median time of the matching delvix-cli command (what the
// data allows); the longest gap and the 99th percentile of a 5 ms heartbeat on the GUI thread
// during the fill, a header click that sorts every row and a search, each gap with the CPU
// time the GUI thread spent in it (on a loaded machine the wall gaps are mostly the
// scheduler's). Then the class id page on four times the classes (the ratio to one time),
// and the peak memory of one window that shows every page of the device, measured in a
// fresh process.
//
// bench_tablepages [--modules N] [--classes N] [--entries N] [--runs N]

#include "ClassListView.h"
#include "DeviceCache.h"
#include "DeviceWindow.h"
#include "GuiHeartbeat.h"
#include "IdFormat.h"
#include "ModuleListView.h"
#include "PageBenchDevice.h"
#include "Portlex.h"
#include "RecordTableModel.h"
#include "RegistryListView.h"
#include "_ZantDevice.h"

#include <QApplication>
#include <QCommandLineParser>
#include <QElapsedTimer>
#include <QEventLoop>
#include <QFile>
#include <QHeaderView>
#include <QProcess>
#include <QTemporaryDir>
#include <QTextStream>
#include <QTimer>

#include <algorithm>
#include <cstdio>
#include <functional>

using namespace PageBenchDevice;

namespace {

QTextStream& out()
{
    static QTextStream stream(stdout);
    return stream;
}

template <typename T>
T median(QVector<T> values)
{
    std::sort(values.begin(), values.end());
    return values.isEmpty() ? T() : values.at(values.size() / 2);
}

struct Gaps
{
    qint64 ms = 0;      // how long the measured work took
    qint64 longest = 0; // the longest gap between two beats
    qint64 p99 = 0;
    qint64 longestCpu = 0; // the most GUI thread CPU time spent within one gap
    qint64 p99Cpu = 0;
    int beats = 0;
};

void stopInto(GuiHeartbeat& heartbeat, Gaps& gaps)
{
    heartbeat.stop();
    gaps.longest = heartbeat.longest();
    gaps.p99 = heartbeat.p99();
    gaps.longestCpu = heartbeat.mostCpu();
    gaps.p99Cpu = heartbeat.p99Cpu();
    gaps.beats = heartbeat.beats();
}

// Runs the event loop until page is complete (or failed), under the heartbeat.
Gaps fill(GatewayComponentWidget* page, const std::function<void()>& start)
{
    GuiHeartbeat heartbeat;
    QEventLoop loop;
    QObject::connect(page, &GatewayComponentWidget::stateChanged, &loop, [&](GatewayComponentWidget::ComponentState state) {
        if (state == GatewayComponentWidget::Complete || state == GatewayComponentWidget::Failed)
            loop.quit();
    });
    QElapsedTimer timer;
    timer.start();
    heartbeat.start();
    start();
    if (page->state() != GatewayComponentWidget::Complete)
        loop.exec();
    Gaps gaps;
    gaps.ms = timer.elapsed();
    // One more turn, so that the paint after the last rows counts too.
    QTimer::singleShot(0, &loop, &QEventLoop::quit);
    loop.exec();
    stopInto(heartbeat, gaps);
    return gaps;
}

// One piece of GUI work (a sort, a search) and the repaint after it, under the heartbeat.
Gaps during(const std::function<void()>& work)
{
    GuiHeartbeat heartbeat;
    QEventLoop loop;
    QElapsedTimer timer;
    Gaps gaps;
    heartbeat.start();
    QTimer::singleShot(20, [&] {
        timer.start();
        work();
        gaps.ms = timer.elapsed();
    });
    QTimer::singleShot(150, &loop, &QEventLoop::quit);
    loop.exec();
    stopInto(heartbeat, gaps);
    return gaps;
}

QString gapText(const Gaps& gaps)
{
    return QStringLiteral("longest gap %1 ms, p99 %2 ms; GUI CPU within a gap: most %3 ms, p99 %4 ms; %5 beats")
        .arg(gaps.longest).arg(gaps.p99).arg(gaps.longestCpu).arg(gaps.p99Cpu).arg(gaps.beats);
}

// The median wall time of "delvix-cli command DEVICE" over runs, its output discarded.
qint64 cliMs(const QString& command, int runs)
{
    QVector<qint64> times;
    for (int i = 0; i < runs; ++i) {
        QProcess cli;
        cli.setStandardOutputFile(QProcess::nullDevice());
        QElapsedTimer timer;
        timer.start();
        cli.start(QCoreApplication::applicationDirPath() + QStringLiteral("/delvix-cli"), {command, DeviceId});
        if (!cli.waitForFinished(120000) || cli.exitCode() != 0)
            return -1;
        times.append(timer.elapsed());
    }
    return median(times);
}

struct Page
{
    QString name;
    QString command;
    std::function<QAction*(DeviceWindow&)> action;
    std::function<GatewayComponentWidget*(DeviceWindow&)> page;
    std::function<QTableView*(DeviceWindow&)> table;
    int sortColumn;
    QString search;
};

// The median of each figure over runs.
Gaps medianOf(const QVector<Gaps>& runs)
{
    const auto of = [&runs](auto field) {
        QVector<qint64> values;
        for (const Gaps& gaps : runs)
            values.append(qint64(gaps.*field));
        return median(values);
    };
    Gaps gaps;
    gaps.ms = of(&Gaps::ms);
    gaps.longest = of(&Gaps::longest);
    gaps.p99 = of(&Gaps::p99);
    gaps.longestCpu = of(&Gaps::longestCpu);
    gaps.p99Cpu = of(&Gaps::p99Cpu);
    gaps.beats = int(of(&Gaps::beats));
    return gaps;
}

void benchPage(const Page& spec, int runs)
{
    QVector<Gaps> fills, sorts, searches;
    int rows = 0;
    QString status;
    for (int run = 0; run < runs; ++run) {
        DeviceWindow window;
        window.setAttribute(Qt::WA_DeleteOnClose, false);
        window.setDevice(DeviceId);
        window.resize(1100, 800);
        window.show();
        GatewayComponentWidget* page = spec.page(window);
        QTableView* table = spec.table(window);
        fills.append(fill(page, [&] { spec.action(window)->trigger(); }));
        rows = table->model()->rowCount();
        status = page->status();
        sorts.append(during([&] { table->horizontalHeader()->setSortIndicator(spec.sortColumn, Qt::DescendingOrder); }));
        searches.append(during([&] { page->search(spec.search); }));
    }
    const Gaps filled = medianOf(fills);
    const qint64 cli = cliMs(spec.command, runs);
    out() << QStringLiteral("%1: %2 rows, status \"%3\"\n").arg(spec.name).arg(rows).arg(status);
    out() << QStringLiteral("  ready after %1 ms (target <= 1000 ms); delvix-cli %2: %3 ms, ratio %4\n")
                 .arg(filled.ms)
                 .arg(spec.command)
                 .arg(cli)
                 .arg(cli > 0 ? double(filled.ms) / double(cli) : 0.0, 0, 'f', 2);
    out() << QStringLiteral("  fill: %1 (targets: longest <= 33 ms, p99 <= 16 ms)\n").arg(gapText(filled));
    const Gaps sorted = medianOf(sorts);
    out() << QStringLiteral("  header-click sort of %1 rows: %2 ms; %3\n").arg(rows).arg(sorted.ms).arg(gapText(sorted));
    const Gaps searched = medianOf(searches);
    out() << QStringLiteral("  search \"%1\": %2 ms; %3\n").arg(spec.search).arg(searched.ms).arg(gapText(searched));
    out().flush();
}

// The class id page alone on classes (the generated device's, renumbered and repeated to
// count): median time from the record to "Ready" and the fill's gaps.
Gaps classFill(const DeviceCache& device, int count, int runs)
{
    DeviceCache cache;
    cache.deviceData = device.deviceData;
    const QList<IdRecord> records = device.classes.values();
    for (int k = 0; k < count && !records.isEmpty(); ++k) {
        IdRecord record = records.at(k % records.size());
        record.id = formatId(0x10000000 + quint32(k));
        cache.classes.insert(record.id, record);
    }
    QVector<Gaps> fills;
    for (int run = 0; run < runs; ++run) {
        ClassListView page;
        page.resize(1100, 800);
        page.show();
        fills.append(fill(&page, [&] { page.setDeviceRecord(&cache); }));
    }
    return medianOf(fills);
}

// The process's resident memory now, in MB.
long residentMb()
{
    QFile status(QStringLiteral("/proc/self/status"));
    if (!status.open(QIODevice::ReadOnly))
        return -1;
    for (const QByteArray& line : status.readAll().split('\n')) {
        if (line.startsWith("VmRSS:"))
            return line.mid(6).trimmed().split(' ').first().toLong() / 1024;
    }
    return -1;
}

// In a fresh process: one window on the device, every page shown in turn until it is complete
// (or for at most 10 s); then the resident memory before and after the window, and the peak.
int memoryOfOneWindow()
{
    const long before = residentMb();
    DeviceWindow window;
    window.setAttribute(Qt::WA_DeleteOnClose, false);
    window.setDevice(DeviceId);
    window.resize(1100, 800);
    window.show();
    const QList<QAction*> actions = {window.action_Phone_Information, window.action_Modules, window.action_Class_IDs,
                                     window.action_Family_Tree, window.action_ISettings, window.action_Registry,
                                     window.actionDevice_File_System, window._actionLoaded_Modules, window._actionThreads,
                                     window._actionLevelView};
    for (QAction* action : actions) {
        action->trigger();
        auto* page = qobject_cast<GatewayComponentWidget*>(window._stackedWidget->currentWidget());
        QElapsedTimer waited;
        waited.start();
        while (page && page->state() != GatewayComponentWidget::Complete && page->state() != GatewayComponentWidget::Failed
               && waited.elapsed() < 10000)
            QCoreApplication::processEvents(QEventLoop::AllEvents, 50);
    }
    std::printf("%ld %ld %ld\n", before, residentMb(), peakMemoryMb());
    return 0;
}

} // namespace

int main(int argc, char** argv)
{
    QTemporaryDir work;
    useOffscreenAndWorkSettings(work);
    QApplication app(argc, argv);
    QCommandLineParser options;
    options.addHelpOption();
    options.addOption({QStringLiteral("modules"), QStringLiteral("modules of the image"), QStringLiteral("N"), QStringLiteral("10000")});
    options.addOption({QStringLiteral("classes"), QStringLiteral("classes of the image"), QStringLiteral("N"), QStringLiteral("20000")});
    options.addOption({QStringLiteral("entries"), QStringLiteral("registry entries of the image"), QStringLiteral("N"),
                       QStringLiteral("20000")});
    options.addOption({QStringLiteral("runs"), QStringLiteral("runs of each measurement"), QStringLiteral("N"), QStringLiteral("3")});
    options.addOption({QStringLiteral("memory-of-one-window"), QStringLiteral("(internal) measure one window on a served device")});
    options.process(app);
    if (options.isSet(QStringLiteral("memory-of-one-window"))) {
        Portlex::Initialize();
        return connectDevice() ? memoryOfOneWindow() : 1;
    }
    const int modules = options.value(QStringLiteral("modules")).toInt();
    const int classes = options.value(QStringLiteral("classes")).toInt();
    const int entries = options.value(QStringLiteral("entries")).toInt();
    const int runs = std::max(1, options.value(QStringLiteral("runs")).toInt());

    const QString image = work.filePath(QStringLiteral("image"));
    const QString sockets = work.filePath(QStringLiteral("sockets"));
    const QStringList generate = {QStringLiteral("generate"), image, QStringLiteral("--modules"), QString::number(modules),
                                  QStringLiteral("--classes"), QString::number(classes), QStringLiteral("--mime-types"),
                                  QString::number(entries), QStringLiteral("--files"), QStringLiteral("0"),
                                  QStringLiteral("--processes"), QStringLiteral("0")};
    if (!work.isValid() || QProcess::execute(simulatorPath(), generate) != 0) {
        std::fprintf(stderr, "cannot generate the image with %s\n", qPrintable(simulatorPath()));
        return 1;
    }
    QProcess server;
    startSimulator(server, image, sockets);
    const QSharedPointer<_ZantDevice> device = connectDevice();
    if (!device) {
        std::fprintf(stderr, "the simulator did not answer: %s\n", qPrintable(QString::fromLocal8Bit(server.readAll())));
        return 1;
    }
    out() << QStringLiteral("image: %1 modules, %2 classes, %3 registry entries; median of %4 runs\n")
                 .arg(modules).arg(device->cache()->classes.size()).arg(entries).arg(runs);

    const QList<Page> pages = {
        {QStringLiteral("module list"), QStringLiteral("modules"), [](DeviceWindow& w) { return w.action_Modules; },
         [](DeviceWindow& w) { return w._moduleListView; }, [](DeviceWindow& w) { return w._moduleListView->_moduleTable; },
         1, QStringLiteral("777")},
        {QStringLiteral("class id list"), QStringLiteral("classes"), [](DeviceWindow& w) { return w.action_Class_IDs; },
         [](DeviceWindow& w) { return w._classListView; }, [](DeviceWindow& w) { return w._classListView->_classIDTable; },
         0, QStringLiteral("777")},
        {QStringLiteral("registry"), QStringLiteral("registry"), [](DeviceWindow& w) { return w.action_Registry; },
         [](DeviceWindow& w) { return w._registryListView; }, [](DeviceWindow& w) { return w._registryListView->_registryTable; },
         3, QStringLiteral("777")},
    };
    for (const Page& page : pages)
        benchPage(page, runs);

    const Gaps once = classFill(*device->cache(), classes, runs);
    const Gaps fourTimes = classFill(*device->cache(), classes * 4, runs);
    out() << QStringLiteral("class id page alone: %1 classes ready after %2 ms (%3);\n  %4 classes after %5 ms (%6);\n"
                            "  ratio %7 (target <= 4.5)\n")
                 .arg(classes).arg(once.ms).arg(gapText(once))
                 .arg(classes * 4).arg(fourTimes.ms).arg(gapText(fourTimes))
                 .arg(once.ms > 0 ? double(fourTimes.ms) / double(once.ms) : 0.0, 0, 'f', 2);
    out().flush();

    QProcess memory;
    memory.start(QCoreApplication::applicationFilePath(), {QStringLiteral("--memory-of-one-window")});
    memory.waitForFinished(300000);
    const QStringList figures = QString::fromLocal8Bit(memory.readAllStandardOutput()).simplified().split(QLatin1Char(' '));
    if (figures.size() == 3)
        out() << QStringLiteral("one window showing every page: resident %1 MB with the window, %2 MB before it; "
                                "peak of the process %3 MB (target <= 150 MB)\n")
                     .arg(figures.at(1), figures.at(0), figures.at(2));
    else
        out() << QStringLiteral("one window showing every page: not measured (%1)\n").arg(QString::fromLocal8Bit(memory.readAllStandardError()));
    out() << QStringLiteral("measured on a shared machine: figures vary with its load\n");

    Portlex::Destroy();
    server.terminate();
    server.waitForFinished();
    return 0;
}
