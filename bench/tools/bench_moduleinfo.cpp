// Opens the module information dialog on a module of 5,000 classes (unless told otherwise),
// from a MIF file on disk and from a device that a real simulator serves, and prints for
// each route: the time to build the dialog, to fill its view, to its first paint (together
// "opened and filled"), and to build its export; the first dialog of the process, which also
// loads the name databases, on a line of its own.
//
// bench_moduleinfo [--classes N] [--rounds N]

#include "MifEntry.h"
#include "MifWriter.h"
#include "ModuleInfoDialog.h"
#include "ModuleInfoView.h"
#include "PageBenchDevice.h"
#include "Portlex.h"

#include <QApplication>
#include <QCommandLineParser>
#include <QDir>
#include <QElapsedTimer>
#include <QEventLoop>
#include <QFile>
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

// Every fourth class is one the class database knows, the others are not.
MifEntry largeModule(int classes)
{
    const quint32 known[] = {0x01011001, 0x01011002, 0x01012001, 0x01013001};
    MifEntry entry;
    for (int i = 0; i < classes; ++i)
        entry.classes.append(i % 4 == 0 ? known[(i / 4) % 4] : 0x0A000000u + quint32(i));
    for (int i = 0; i < 20; ++i) {
        MifApplet applet;
        applet.classId = entry.classes.at(i);
        applet.baseId = quint16(i);
        applet.appType = 1;
        entry.applets.append(applet);
        entry.externalClasses.append(0x0B000000u + quint32(i));
        entry.mimeTypes.append({applet.classId, known[0], QStringLiteral("application/x-bench-%1").arg(i)});
        if (i < 10)
            entry.notifiers.append({known[1], applet.classId, 0xFFu});
    }
    entry.classCount = quint16(entry.classes.size());
    entry.appletCount = quint16(entry.applets.size());
    entry.externalClassCount = quint16(entry.externalClasses.size());
    entry.notificationCount = quint16(entry.notifiers.size());
    entry.mimeTypeCount = quint16(entry.mimeTypes.size());
    return entry;
}

// Tells when a widget has painted.
class PaintWatch : public QObject
{
public:
    explicit PaintWatch(QEventLoop& loop)
        : m_loop(loop)
    {
    }
    bool painted = false;

protected:
    bool eventFilter(QObject* watched, QEvent* event) override
    {
        if (event->type() == QEvent::Paint && !painted) {
            painted = true;
            m_loop.quit();
        }
        return QObject::eventFilter(watched, event);
    }

private:
    QEventLoop& m_loop;
};

struct Opening
{
    double constructMs = 0;
    double fillMs = 0;
    double paintMs = 0;
    double exportMs = 0;
    int rows = 0;
    double openedMs() const { return constructMs + fillMs + paintMs; }
};

double msSince(QElapsedTimer& timer)
{
    const double ms = timer.nsecsElapsed() / 1e6;
    timer.restart();
    return ms;
}

// One dialog from construction to its first paint, then its export; closed afterwards.
Opening openOnce(const std::function<void(ModuleInfoDialog*)>& open)
{
    Opening opening;
    QElapsedTimer timer;
    timer.start();
    auto* dialog = new ModuleInfoDialog;
    opening.constructMs = msSince(timer);
    open(dialog);
    opening.fillMs = msSince(timer);

    QEventLoop loop;
    PaintWatch watch(loop);
    dialog->_moduleInfoView->_classIDTable->viewport()->installEventFilter(&watch);
    dialog->show();
    QTimer::singleShot(10000, &loop, &QEventLoop::quit);
    if (!watch.painted)
        loop.exec();
    opening.paintMs = msSince(timer);
    dialog->_moduleInfoView->_classIDTable->viewport()->removeEventFilter(&watch);

    const QString xml = dialog->_moduleInfoView->mifEntryXml();
    opening.exportMs = msSince(timer);
    opening.rows = dialog->_moduleInfoView->_classIDTable->rowCount();
    if (xml.isEmpty() || !watch.painted)
        opening.rows = -1;
    dialog->close();
    QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
    return opening;
}

void line(const QString& what, const Opening& o)
{
    out() << qSetFieldWidth(26) << Qt::left << what << qSetFieldWidth(0)
          << QStringLiteral("opened and filled %1 ms (build %2, fill %3, first paint %4); export %5 ms; %6 class rows\n")
                 .arg(o.openedMs(), 0, 'f', 1)
                 .arg(o.constructMs, 0, 'f', 1)
                 .arg(o.fillMs, 0, 'f', 1)
                 .arg(o.paintMs, 0, 'f', 1)
                 .arg(o.exportMs, 0, 'f', 1)
                 .arg(o.rows);
    out().flush();
}

// The best and the median round by time to opened and filled.
void summary(const QString& route, QList<Opening> rounds)
{
    std::sort(rounds.begin(), rounds.end(),
              [](const Opening& a, const Opening& b) { return a.openedMs() < b.openedMs(); });
    line(route + QStringLiteral(" best"), rounds.first());
    line(route + QStringLiteral(" median"), rounds.at(rounds.size() / 2));
}

} // namespace

int main(int argc, char** argv)
{
    QTemporaryDir work;
    useOffscreenAndWorkSettings(work);
    QApplication app(argc, argv);
    QCommandLineParser options;
    options.addHelpOption();
    options.addOption({QStringLiteral("classes"), QStringLiteral("classes of the module"), QStringLiteral("N"), QStringLiteral("5000")});
    options.addOption({QStringLiteral("rounds"), QStringLiteral("dialogs per route"), QStringLiteral("N"), QStringLiteral("9")});
    options.process(app);
    const int classes = std::clamp(options.value(QStringLiteral("classes")).toInt(), 1, 0xFFFF);
    const int rounds = std::max(1, options.value(QStringLiteral("rounds")).toInt());

    const QString image = work.filePath(QStringLiteral("image"));
    const QString sockets = work.filePath(QStringLiteral("sockets"));
    const QString mif = work.filePath(QStringLiteral("bench.mif"));
    QString error;
    if (!work.isValid() || !MifWriter::writeModuleFile(mif, largeModule(classes), &error)) {
        std::fprintf(stderr, "cannot write the module: %s\n", qPrintable(error));
        return 1;
    }
    const QString moduleFolder = image + QStringLiteral("/flash/usermod/bench");
    if (!generateImage(image, 0, 0) || !QDir().mkpath(moduleFolder)
        || !QFile::copy(mif, moduleFolder + QStringLiteral("/bench.mif"))) {
        std::fprintf(stderr, "cannot build the image with %s\n", qPrintable(simulatorPath()));
        return 1;
    }
    out() << QStringLiteral("module: %1 classes, MIF %2 bytes; %3 rounds per route (%4)\n")
                 .arg(classes).arg(QFile(mif).size()).arg(rounds).arg(qEnvironmentVariable("QT_QPA_PLATFORM"));

    const auto fromFile = [&](ModuleInfoDialog* dialog) { dialog->openMifFile(mif, QStringLiteral("bench")); };
    line(QStringLiteral("file, first dialog"), openOnce(fromFile));
    QList<Opening> fileRounds;
    for (int i = 0; i < rounds; ++i)
        fileRounds.append(openOnce(fromFile));
    summary(QStringLiteral("file,"), fileRounds);

    QProcess server;
    startSimulator(server, image, sockets);
    if (!connectDevice()) {
        std::fprintf(stderr, "the simulator did not answer: %s\n", qPrintable(QString::fromLocal8Bit(server.readAll())));
        return 1;
    }
    ModuleInfo module;
    module.name = QStringLiteral("bench");
    module.path = QStringLiteral("/usermod/bench/bench.mif");
    const auto fromDevice = [&](ModuleInfoDialog* dialog) { dialog->openDeviceModule(DeviceId, module); };
    QList<Opening> deviceRounds;
    for (int i = 0; i < rounds; ++i)
        deviceRounds.append(openOnce(fromDevice));
    summary(QStringLiteral("device,"), deviceRounds);
    out() << QStringLiteral("target: opened and filled under 200 ms; peak memory %1 MB\n").arg(peakMemoryMb());

    Portlex::Destroy();
    server.terminate();
    server.waitForFinished();
    return 0;
}
