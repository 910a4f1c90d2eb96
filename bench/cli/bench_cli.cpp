// Runs "delvix-cli modules", "classes", "snapshot" (no hashes) and "diff" of two snapshots
// against a generated image (10,000 modules, 20,000 classes and 50,000 files unless told
// otherwise) served by a real simulator, each three times, and prints the median wall time
// and peak memory of the tool's process (and the snapshot's size); then, in the same run,
// the time the device window's Modules and Class IDs pages take to "Ready".
//
// bench_cli [--modules N] [--classes N] [--files N] [--runs N]

#include "ClassListView.h"
#include "DeviceWindow.h"
#include "ModuleListView.h"
#include "PageBenchDevice.h"
#include "Portlex.h"

#include <QApplication>
#include <QCommandLineParser>
#include <QElapsedTimer>
#include <QEventLoop>
#include <QFile>
#include <QProcess>
#include <QTemporaryDir>
#include <QTextStream>

#include <fcntl.h>
#include <spawn.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstring>

extern char** environ;

using namespace PageBenchDevice;

namespace {

QTextStream& out()
{
    static QTextStream stream(stdout);
    return stream;
}

struct Run
{
    int status = -1; // the exit status, -1 when it did not end normally
    qint64 wallMs = 0;
    long peakKb = 0; // the child's own maximum resident set
    qint64 outputBytes = 0;
};

// The launcher: "bench_cli --launch OUTPUT TOOL ARGUMENTS..." runs the tool with its output
// in OUTPUT, as a pipeline would redirect it, and prints "status wall-ms peak-kB". It is a
// fresh small process on purpose: a child takes over, as its peak, the resident memory of
// the process it was spawned from, and this benchmark's own is larger than the tool's. (A
// figure below the launcher's own, about 16 MB, reads as that.)
int launch(char** argv)
{
    posix_spawn_file_actions_t files;
    posix_spawn_file_actions_init(&files);
    posix_spawn_file_actions_addopen(&files, STDOUT_FILENO, argv[2], O_WRONLY | O_CREAT | O_TRUNC, 0600);
    timespec start {}, end {};
    clock_gettime(CLOCK_MONOTONIC, &start);
    pid_t child = 0;
    int status = 0;
    rusage usage {};
    if (posix_spawn(&child, argv[3], &files, nullptr, argv + 3, environ) != 0
        || wait4(child, &status, 0, &usage) != child)
        return 1;
    posix_spawn_file_actions_destroy(&files);
    clock_gettime(CLOCK_MONOTONIC, &end);
    const long long wallMs = (end.tv_sec - start.tv_sec) * 1000LL + (end.tv_nsec - start.tv_nsec) / 1000000;
    std::printf("%d %lld %ld\n", WIFEXITED(status) ? WEXITSTATUS(status) : -1, wallMs, usage.ru_maxrss);
    return 0;
}

Run runTool(const QString& tool, const QStringList& arguments, const QString& outputPath)
{
    Run run;
    QProcess launcher;
    launcher.setProcessChannelMode(QProcess::ForwardedErrorChannel);
    launcher.start(QCoreApplication::applicationFilePath(),
        QStringList {QStringLiteral("--launch"), outputPath, tool} + arguments);
    if (!launcher.waitForFinished(-1) || launcher.exitCode() != 0)
        return run;
    const QList<QByteArray> figures = launcher.readAllStandardOutput().simplified().split(' ');
    if (figures.size() != 3)
        return run;
    run.status = figures.at(0).toInt();
    run.wallMs = figures.at(1).toLongLong();
    run.peakKb = figures.at(2).toLong();
    run.outputBytes = QFile(outputPath).size();
    return run;
}

template<typename T> T median(QVector<T> values)
{
    std::sort(values.begin(), values.end());
    return values.at(values.size() / 2);
}

// Targets: wall time in ms and peak memory in MB.
void benchCommand(const QStringList& arguments, int runs, const QString& outputPath, int targetMs = 1000, int targetMb = 100)
{
    const QString tool = QCoreApplication::applicationDirPath() + QStringLiteral("/delvix-cli");
    QVector<qint64> walls;
    QVector<long> peaks;
    out() << QStringLiteral("delvix-cli %1:\n").arg(arguments.join(QLatin1Char(' ')));
    out().flush();
    for (int i = 0; i < runs; ++i) {
        const Run run = runTool(tool, arguments, outputPath);
        out() << QStringLiteral("  run %1: exit %2, %3 ms, peak %4 MB, %5 KB written\n")
                     .arg(i + 1)
                     .arg(run.status)
                     .arg(run.wallMs)
                     .arg(run.peakKb / 1024.0, 0, 'f', 1)
                     .arg(run.outputBytes / 1024);
        out().flush();
        if (run.status != 0)
            return;
        walls.append(run.wallMs);
        peaks.append(run.peakKb);
    }
    out() << QStringLiteral("  median: %1 ms (target < %3 ms), peak %2 MB (target < %4 MB)\n")
                 .arg(median(walls))
                 .arg(median(peaks) / 1024.0, 0, 'f', 1)
                 .arg(targetMs)
                 .arg(targetMb);
    out().flush();
}

// Runs the event loop until page is complete or failed.
void waitUntilDone(GatewayComponentWidget* page)
{
    QEventLoop loop;
    QObject::connect(page, &GatewayComponentWidget::stateChanged, &loop,
        [&](GatewayComponentWidget::ComponentState state) {
            if (state == GatewayComponentWidget::Complete || state == GatewayComponentWidget::Failed)
                loop.quit();
        });
    if (page->state() != GatewayComponentWidget::Complete && page->state() != GatewayComponentWidget::Failed)
        loop.exec();
}

void reportPage(const QString& name, GatewayComponentWidget* page, const QTableView* table, qint64 readyMs)
{
    out() << QStringLiteral("GUI %1 page: %2 rows, status \"%3\" after %4 ms\n")
                 .arg(name)
                 .arg(table->model()->rowCount())
                 .arg(page->status())
                 .arg(readyMs);
    out().flush();
}

} // namespace

int main(int argc, char** argv)
{
    if (argc > 3 && std::strcmp(argv[1], "--launch") == 0)
        return launch(argv);
    QTemporaryDir work;
    useOffscreenAndWorkSettings(work);
    QApplication app(argc, argv);
    QCommandLineParser options;
    options.addHelpOption();
    options.addOption({QStringLiteral("modules"), QStringLiteral("modules of the image"), QStringLiteral("N"),
        QStringLiteral("10000")});
    options.addOption({QStringLiteral("classes"), QStringLiteral("classes of the image"), QStringLiteral("N"),
        QStringLiteral("20000")});
    options.addOption({QStringLiteral("files"), QStringLiteral("files of the image"), QStringLiteral("N"),
        QStringLiteral("50000")});
    options.addOption({QStringLiteral("runs"), QStringLiteral("runs of each command"), QStringLiteral("N"),
        QStringLiteral("3")});
    options.process(app);
    const int modules = options.value(QStringLiteral("modules")).toInt();
    const int classes = options.value(QStringLiteral("classes")).toInt();
    const int runs = std::max(1, options.value(QStringLiteral("runs")).toInt());

    QProcess server;
    const int files = options.value(QStringLiteral("files")).toInt();
    const QSharedPointer<_ZantDevice> device = serveGeneratedDevice(server, work, modules, classes, 0, PageBenchDevice::DeviceId, files);
    if (!device)
        return 1;
    out() << QStringLiteral("image: %1 modules, %2 classes, %3 files\n").arg(modules).arg(device->cache()->classes.size()).arg(files);

    const QString outputPath = work.filePath(QStringLiteral("output"));
    benchCommand({QStringLiteral("modules"), DeviceId}, runs, outputPath);
    benchCommand({QStringLiteral("classes"), DeviceId}, runs, outputPath);
    const QString first = work.filePath(QStringLiteral("first.json")), second = work.filePath(QStringLiteral("second.json"));
    benchCommand({QStringLiteral("snapshot"), DeviceId, QStringLiteral("-o"), first}, runs, outputPath, 3000, 200);
    out() << QStringLiteral("  snapshot size: %1 MB\n").arg(QFile(first).size() / 1048576.0, 0, 'f', 1);
    benchCommand({QStringLiteral("snapshot"), DeviceId, QStringLiteral("-o"), second}, 1, outputPath, 3000, 200);
    benchCommand({QStringLiteral("diff"), first, second}, runs, outputPath, 1000, 200);

    {
        DeviceWindow window;
        window.setAttribute(Qt::WA_DeleteOnClose, false);
        window.setDevice(DeviceId);
        window.show();
        QElapsedTimer sinceStart;
        sinceStart.start();
        window.action_Modules->trigger();
        waitUntilDone(window._moduleListView);
        reportPage(QStringLiteral("Modules"), window._moduleListView, window._moduleListView->_moduleTable,
            sinceStart.elapsed());
    }
    {
        DeviceWindow window;
        window.setAttribute(Qt::WA_DeleteOnClose, false);
        QElapsedTimer sinceStart;
        sinceStart.start();
        window.setDevice(DeviceId);
        window.show();
        window.action_Class_IDs->trigger();
        waitUntilDone(window._classListView);
        reportPage(QStringLiteral("Class IDs"), window._classListView, window._classListView->_classIDTable,
            sinceStart.elapsed());
    }

    Portlex::Destroy();
    server.terminate();
    server.waitForFinished();
    return 0;
}
