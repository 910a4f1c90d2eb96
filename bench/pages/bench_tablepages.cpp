// Fills the module list and the class id list of a device window from a generated image
// (10,000 modules and 20,000 classes unless told otherwise) served by a real simulator, and
// prints for each page: the time from its start to "Ready", the longest gap of a 5 ms
// heartbeat on the GUI thread during the fill, the time of three-character searches over
// the full table, and the process's peak memory.
//
// bench_tablepages [--modules N] [--classes N]

#include "ClassListView.h"
#include "ClassListViewThread.h"
#include "DeviceWindow.h"
#include "ModuleListView.h"
#include "PageBenchDevice.h"
#include "Portlex.h"

#include <QApplication>
#include <QCommandLineParser>
#include <QElapsedTimer>
#include <QEventLoop>
#include <QProcess>
#include <QTemporaryDir>
#include <QTextStream>
#include <QThread>
#include <QTimer>

#include <time.h>

#include <algorithm>
#include <cstdio>

using namespace PageBenchDevice;

namespace {

QTextStream& out()
{
    static QTextStream stream(stdout);
    return stream;
}

// CPU time of the calling thread: on a busy machine it tells our own work from the time
// the scheduler gave to other processes.
qint64 threadCpuMs()
{
    timespec now {};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
    return qint64(now.tv_sec) * 1000 + now.tv_nsec / 1000000;
}

struct Fill
{
    qint64 longestGapMs = 0;
    qint64 gapCpuMs = 0;  // GUI thread CPU time within the longest gap
    qint64 gapEndMs = 0;  // when the longest gap ended, from the start of the fill
    int gapEndRows = 0;   // rows in the table then
};

// Runs the event loop until page is complete, with a 5 ms heartbeat on the GUI thread,
// and tells where its longest gap was.
Fill fillWithHeartbeat(GatewayComponentWidget* page, const QTableWidget* table)
{
    Fill fill;
    QElapsedTimer sinceStart;
    QElapsedTimer sinceBeat;
    qint64 cpuAtBeat = threadCpuMs();
    const auto beat = [&] {
        const qint64 gap = sinceBeat.restart();
        const qint64 cpu = threadCpuMs();
        if (gap > fill.longestGapMs) {
            fill.longestGapMs = gap;
            fill.gapCpuMs = cpu - cpuAtBeat;
            fill.gapEndMs = sinceStart.elapsed();
            fill.gapEndRows = table->rowCount();
        }
        cpuAtBeat = cpu;
    };
    QTimer heartbeat;
    heartbeat.setTimerType(Qt::PreciseTimer);
    heartbeat.setInterval(5);
    QObject::connect(&heartbeat, &QTimer::timeout, beat);
    QEventLoop loop;
    QObject::connect(page, &GatewayComponentWidget::stateChanged, &loop, [&](GatewayComponentWidget::ComponentState state) {
        if (state == GatewayComponentWidget::Complete || state == GatewayComponentWidget::Failed)
            loop.quit();
    });
    sinceStart.start();
    sinceBeat.start();
    heartbeat.start();
    if (page->state() != GatewayComponentWidget::Complete)
        loop.exec();
    beat();
    return fill;
}

int shownRows(const QTableWidget* table)
{
    int shown = 0;
    for (int row = 0; row < table->rowCount(); ++row)
        shown += table->isRowHidden(row) ? 0 : 1;
    return shown;
}

// A search as the user sees it: the call and the repaint that follows.
void timeSearch(GatewayComponentWidget* page, QTableWidget* table, const QString& text)
{
    QElapsedTimer timer;
    const qint64 cpuBefore = threadCpuMs();
    timer.start();
    page->search(text);
    QCoreApplication::processEvents();
    const qint64 ms = timer.elapsed();
    out() << QStringLiteral("  search \"%1\": %2 ms (%3 ms CPU), %4 rows shown (target < 150 ms)\n")
                 .arg(text).arg(ms).arg(threadCpuMs() - cpuBefore).arg(shownRows(table));
}

void report(const QString& name, GatewayComponentWidget* page, QTableWidget* table, qint64 readyMs, qint64 targetMs,
            const Fill& fill, const QStringList& searches)
{
    out() << name << QStringLiteral(": %1 rows, status \"%2\"\n").arg(table->rowCount()).arg(page->status());
    out() << QStringLiteral("  ready after %1 ms (target <= %2 ms)\n").arg(readyMs).arg(targetMs);
    out() << QStringLiteral("  longest GUI gap during the fill: %1 ms (%2 ms CPU; target < 50 ms), ending %3 ms into the fill with %4 rows\n")
                 .arg(fill.longestGapMs).arg(fill.gapCpuMs).arg(fill.gapEndMs).arg(fill.gapEndRows);
    for (const QString& text : searches)
        timeSearch(page, table, text);
    timeSearch(page, table, QStringLiteral("ab"));
    out() << QStringLiteral("  peak memory so far: %1 MB\n").arg(peakMemoryMb());
    out().flush();
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
    options.process(app);
    const int modules = options.value(QStringLiteral("modules")).toInt();
    const int classes = options.value(QStringLiteral("classes")).toInt();

    QProcess server;
    const QSharedPointer<_ZantDevice> device = serveGeneratedDevice(server, work, modules, classes);
    if (!device)
        return 1;
    out() << QStringLiteral("image: %1 modules, %2 classes; peak memory before the pages: %3 MB\n")
                 .arg(modules).arg(device->cache()->classes.size()).arg(peakMemoryMb());

    {
        DeviceWindow window;
        window.setAttribute(Qt::WA_DeleteOnClose, false);
        window.setDevice(DeviceId);
        window.show();
        QElapsedTimer sinceStart;
        sinceStart.start();
        window.action_Modules->trigger();
        const Fill fill = fillWithHeartbeat(window._moduleListView, window._moduleListView->_moduleTable);
        report(QStringLiteral("module list"), window._moduleListView, window._moduleListView->_moduleTable,
               sinceStart.elapsed(), 3000, fill, {QStringLiteral("777"), QStringLiteral("gen")});
    }
    {
        DeviceWindow window;
        window.setAttribute(Qt::WA_DeleteOnClose, false);
        QElapsedTimer sinceStart;
        sinceStart.start();
        window.setDevice(DeviceId);
        window.show();
        window.action_Class_IDs->trigger();
        const Fill fill = fillWithHeartbeat(window._classListView, window._classListView->_classIDTable);
        const qint64 pacing = qint64(device->cache()->classes.size()) * qint64(ClassListViewThread::StepMs);
        report(QStringLiteral("class id list"), window._classListView, window._classListView->_classIDTable,
               sinceStart.elapsed(), pacing * 6 / 5, fill, {QStringLiteral("777"), QStringLiteral("not")});
    }

    Portlex::Destroy();
    server.terminate();
    server.waitForFinished();
    return 0;
}
