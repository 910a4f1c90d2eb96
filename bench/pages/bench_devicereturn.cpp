// A device window on a generated device (2,000 modules and 5,000 classes unless told
// otherwise) served by a real simulator, and prints:
// - the time from the device's return (the simulator started again under the same id after
//   a kill) to the window connected again and to every page that was shown "Ready" again,
//   next to the time the simulator itself takes to answer;
// - for each dialog that asks the device, opened while the simulator is paused: the longest
//   gap of a 5 ms GUI heartbeat until the dialog has its answer (the call's failure).
//
// bench_devicereturn [--modules N] [--classes N]

#include "DeviceWindow.h"
#include "LockStatusWidget.h"
#include "ModuleInfoDialog.h"
#include "PageBenchDevice.h"
#include "Portlex.h"
#include "SecuritySettingsDialog.h"
#include "_ZantDevice.h"

#include <QApplication>
#include <QCommandLineParser>
#include <QElapsedTimer>
#include <QProcess>
#include <QTemporaryDir>
#include <QTextStream>
#include <QThread>
#include <QTimer>

#include <algorithm>
#include <atomic>
#include <csignal>
#include <cstdio>
#include <functional>

using namespace PageBenchDevice;

namespace {

QTextStream& out()
{
    static QTextStream stream(stdout);
    return stream;
}

// Turns the event loop until done() or the limit; the elapsed milliseconds, -1 past the limit.
qint64 waitFor(const std::function<bool()>& done, int limitMs = 120000)
{
    QElapsedTimer clock;
    clock.start();
    while (!done()) {
        if (clock.hasExpired(limitMs))
            return -1;
        QCoreApplication::processEvents(QEventLoop::AllEvents, 5);
    }
    return clock.elapsed();
}

// The longest gap between two beats of a 5 ms heartbeat while the event loop waits for done().
qint64 longestGap(const std::function<bool()>& done)
{
    QElapsedTimer clock;
    qint64 last = 0, longest = 0;
    QTimer heartbeat;
    QObject::connect(&heartbeat, &QTimer::timeout, [&] {
        longest = std::max(longest, clock.elapsed() - last);
        last = clock.elapsed();
    });
    clock.start();
    heartbeat.start(5);
    if (waitFor(done, 30000) < 0)
        return -1;
    return std::max(longest, clock.elapsed() - last);
}

} // namespace

int main(int argc, char** argv)
{
    QTemporaryDir work;
    useOffscreenAndWorkSettings(work);
    QApplication app(argc, argv);
    QCommandLineParser options;
    options.addHelpOption();
    options.addOption({QStringLiteral("modules"), QStringLiteral("modules of the image"), QStringLiteral("N"), QStringLiteral("2000")});
    options.addOption({QStringLiteral("classes"), QStringLiteral("classes of the image"), QStringLiteral("N"), QStringLiteral("5000")});
    options.process(app);

    QProcess server;
    if (!serveGeneratedDevice(server, work, options.value("modules").toInt(), options.value("classes").toInt()))
        return 1;

    DeviceWindow window;
    window.setAttribute(Qt::WA_DeleteOnClose, false);
    window.setDevice(DeviceId);
    window.show();
    const QList<QAction*> shown = {window.action_Modules, window.action_Class_IDs, window.action_Family_Tree,
                                   window.action_Registry, window._actionThreads, window.action_Phone_Information};
    const auto allReady = [&window, &shown] {
        for (const QAction* action : shown) {
            const GatewayComponentWidget* page = window.pageAt(action->data().toInt());
            if (!page || page->status() != QStringLiteral("Ready"))
                return false;
        }
        return window.deviceConnected();
    };
    for (QAction* action : shown) {
        action->trigger();
        waitFor([&] { return window.pageAt(window._stackedWidget->currentIndex())->status() == QStringLiteral("Ready"); });
    }

    server.kill();
    server.waitForFinished();
    out() << QStringLiteral("window sees the device gone after %1 ms\n").arg(waitFor([&] { return !window.deviceConnected(); }));

    // The simulator's own start, seen from a thread of its own so the window's loop runs on.
    std::atomic<qint64> answeredMs{-1};
    QElapsedTimer sinceReturn;
    sinceReturn.start();
    startSimulator(server, imagePath(work), work.filePath(QStringLiteral("sockets")));
    QThread* probe = QThread::create([&] {
        while (!sinceReturn.hasExpired(120000)) {
            QList<QPair<QString, QString>> devices;
            Portlex::GetDevices(devices);
            if (!devices.isEmpty()) {
                answeredMs = sinceReturn.elapsed();
                return;
            }
            QThread::msleep(10);
        }
    });
    probe->start();
    const qint64 connected = waitFor([&] { return window.deviceConnected(); }) >= 0 ? sinceReturn.elapsed() : -1;
    const qint64 ready = waitFor(allReady) >= 0 ? sinceReturn.elapsed() : -1;
    probe->wait();
    delete probe;
    out() << QStringLiteral("return: simulator answers after %1 ms; window connected after %2 ms; "
                            "%3 pages shown before Ready after %4 ms (%5 ms after the simulator answered; target 2000)\n")
                 .arg(answeredMs.load()).arg(connected).arg(shown.size()).arg(ready).arg(ready - answeredMs.load());

    // Each dialog that asks the device, opened while it is paused (a pid of 0 would stop us).
    if (server.state() != QProcess::Running) {
        std::fprintf(stderr, "the simulator did not come back: %s\n", qPrintable(QString::fromLocal8Bit(server.readAll())));
        return 1;
    }
    ::kill(pid_t(server.processId()), SIGSTOP);
    {
        auto* info = new ModuleInfoDialog;
        info->openDeviceModule(DeviceId, ModuleInfo());
        info->show();
        out() << QStringLiteral("paused device, module information: longest GUI gap %1 ms (target 33)\n")
                     .arg(longestGap([info] { return !info->isBusy(); }));
        info->close();
    }
    {
        SecuritySettingsDialog security;
        security.setDevice(DeviceId);
        security.show();
        out() << QStringLiteral("paused device, security settings: longest GUI gap %1 ms (target 33)\n")
                     .arg(longestGap([&security] { return !security._securitySettings->isBusy(); }));
    }
    {
        LockStatusWidget* indicator = window.findChild<LockStatusWidget*>();
        indicator->setDevice(DeviceId);
        out() << QStringLiteral("paused device, enablement indicator: longest GUI gap %1 ms (target 33)\n")
                     .arg(longestGap([indicator] { return !indicator->isBusy(); }));
    }
    ::kill(pid_t(server.processId()), SIGCONT);
    out().flush();
    server.kill();
    server.waitForFinished();
    return 0;
}
