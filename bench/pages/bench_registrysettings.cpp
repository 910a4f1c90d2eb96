// Fills the registry and the settings tree pages of a device window from a generated image
// (20,000 MIME records and a settings store of 20,000 nodes unless told otherwise) served
// by a real simulator, and prints for each page: the time from opening the window to
// "Ready", the longest gap of a 5 ms heartbeat on the GUI thread meanwhile, and the
// process's peak memory.
//
// bench_registrysettings [--entries N] [--nodes N]

#include "CITreeWidgetItem.h"
#include "DeviceWindow.h"
#include "ISettingsTreeView.h"
#include "PageBenchDevice.h"
#include "Portlex.h"
#include "RegistryListView.h"

#include <QApplication>
#include <QCommandLineParser>
#include <QElapsedTimer>
#include <QEventLoop>
#include <QProcess>
#include <QTemporaryDir>
#include <QTextStream>
#include <QTimer>
#include <QTreeWidgetItemIterator>

#include <time.h>

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

bool generateStoreImage(const QString& image, int entries, int nodes)
{
    // Two MIME records per module: the second round claims the first one's types again.
    const int modules = std::max(1, entries / 2);
    const QStringList arguments = {QStringLiteral("generate"), image,
                                   QStringLiteral("--modules"), QString::number(modules),
                                   QStringLiteral("--classes"), QString::number(modules),
                                   QStringLiteral("--files"), QStringLiteral("0"),
                                   QStringLiteral("--processes"), QStringLiteral("0"),
                                   QStringLiteral("--mime-types"), QString::number(entries),
                                   QStringLiteral("--settings"), QString::number(nodes)};
    return QProcess::execute(simulatorPath(), arguments) == 0;
}

// CPU time of the calling thread: on a busy machine it tells our own work from the time
// the scheduler gave to other processes.
qint64 threadCpuMs()
{
    timespec now {};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
    return qint64(now.tv_sec) * 1000 + now.tv_nsec / 1000000;
}

// What a fill took: the time from opening the window to the page's completion, and the
// longest gap between two beats of a 5 ms timer meanwhile, with the GUI thread's CPU time
// in it and the time the gap ended.
struct Fill
{
    qint64 readyMs = 0;
    qint64 gapMs = 0;
    qint64 gapCpuMs = 0;
    qint64 gapEndMs = 0;
    int items = 0; // what the page shows then
};

// Opens a window on the device, lets show bring up the page and runs the event loop until
// the page is complete or has failed; count tells what it shows.
Fill openAndFill(const std::function<GatewayComponentWidget*(DeviceWindow&)>& show,
                 const std::function<int(DeviceWindow&)>& count)
{
    Fill fill;
    QElapsedTimer sinceStart;
    QElapsedTimer sinceBeat;
    qint64 cpuAtBeat = 0;
    const auto beat = [&] {
        const qint64 gap = sinceBeat.restart();
        const qint64 cpu = threadCpuMs();
        if (gap > fill.gapMs) {
            fill.gapMs = gap;
            fill.gapCpuMs = cpu - cpuAtBeat;
            fill.gapEndMs = sinceStart.elapsed();
        }
        cpuAtBeat = cpu;
    };
    sinceStart.start();
    DeviceWindow window;
    window.setAttribute(Qt::WA_DeleteOnClose, false);
    window.setDevice(DeviceId);
    window.show();
    GatewayComponentWidget* page = show(window);

    QTimer heartbeat;
    heartbeat.setTimerType(Qt::PreciseTimer);
    heartbeat.setInterval(5);
    QObject::connect(&heartbeat, &QTimer::timeout, beat);
    QEventLoop loop;
    QObject::connect(page, &GatewayComponentWidget::stateChanged, &loop,
                     [&](GatewayComponentWidget::ComponentState state) {
                         if (state == GatewayComponentWidget::Complete || state == GatewayComponentWidget::Failed)
                             loop.quit();
                     });
    // Building the window is not a gap of the fill.
    sinceBeat.start();
    cpuAtBeat = threadCpuMs();
    heartbeat.start();
    if (page->state() != GatewayComponentWidget::Complete)
        loop.exec();
    fill.readyMs = sinceStart.elapsed();
    // One more beat, so a block at the very end counts too.
    QTimer::singleShot(0, &loop, &QEventLoop::quit);
    loop.exec();
    beat();
    fill.items = count(window);
    out() << QStringLiteral("  status \"%1\"\n").arg(page->status());
    return fill;
}

void reportFill(const Fill& fill, const QString& target)
{
    out() << QStringLiteral("  ready %1 ms after the window opened (%2)\n").arg(fill.readyMs).arg(target);
    out() << QStringLiteral("  longest GUI gap: %1 ms (%2 ms CPU), ending %3 ms after the window opened (target < 33 ms)\n")
                 .arg(fill.gapMs)
                 .arg(fill.gapCpuMs)
                 .arg(fill.gapEndMs);
    out() << QStringLiteral("  peak memory so far: %1 MB\n").arg(peakMemoryMb());
    out().flush();
}

int nodeItems(QTreeWidget* tree)
{
    int nodes = 0;
    for (QTreeWidgetItemIterator it(tree); *it; ++it)
        nodes += static_cast<CITreeWidgetItem*>(*it)->kind() == ISettingsTreeView::ValueKind ? 0 : 1;
    return nodes;
}

} // namespace

int main(int argc, char** argv)
{
    QTemporaryDir work;
    useOffscreenAndWorkSettings(work);
    QApplication app(argc, argv);
    QCommandLineParser options;
    options.addHelpOption();
    options.addOption({QStringLiteral("entries"), QStringLiteral("registry entries of the image"), QStringLiteral("N"), QStringLiteral("20000")});
    options.addOption({QStringLiteral("nodes"), QStringLiteral("settings nodes of the image"), QStringLiteral("N"), QStringLiteral("20000")});
    options.process(app);
    const int entries = options.value(QStringLiteral("entries")).toInt();
    const int nodes = options.value(QStringLiteral("nodes")).toInt();

    const QString image = work.filePath(QStringLiteral("image"));
    const QString sockets = work.filePath(QStringLiteral("sockets"));
    if (!work.isValid() || !generateStoreImage(image, entries, nodes)) {
        std::fprintf(stderr, "cannot generate the image with %s\n", qPrintable(simulatorPath()));
        return 1;
    }
    QProcess server;
    startSimulator(server, image, sockets);
    if (!connectDevice()) {
        std::fprintf(stderr, "the simulator did not answer: %s\n", qPrintable(QString::fromLocal8Bit(server.readAll())));
        return 1;
    }
    out() << QStringLiteral("image: %1 registry entries, %2 settings nodes; peak memory before the pages: %3 MB\n")
                 .arg(entries).arg(nodes).arg(peakMemoryMb());

    out() << QStringLiteral("registry:\n");
    const Fill registry = openAndFill(
        [](DeviceWindow& window) {
            window.action_Registry->trigger();
            return window._registryListView;
        },
        [](DeviceWindow& window) { return window._registryListView->_registryTable->model()->rowCount(); });
    out() << QStringLiteral("  %1 rows\n").arg(registry.items);
    reportFill(registry, QStringLiteral("target < 1000 ms"));

    out() << QStringLiteral("settings tree:\n");
    const Fill settings = openAndFill(
        [](DeviceWindow& window) {
            window.action_ISettings->trigger();
            return window._settingsTreeView;
        },
        [](DeviceWindow& window) { return nodeItems(window._settingsTreeView->_settingsTree); });
    out() << QStringLiteral("  %1 node items\n").arg(settings.items);
    // bench_treepages times this page beside "delvix-cli settings", median of three.
    reportFill(settings, QStringLiteral("target < 1500 ms"));

    Portlex::Destroy();
    server.terminate();
    server.waitForFinished();
    return 0;
}
