// Fills the tree pages from generated images served by real simulators and prints, median
// of --runs runs: the family tree (20,000 classes unless told otherwise) and the settings
// tree (20,000 nodes) from start to "Ready", each beside the matching delvix-cli command on
// the same device; the longest gap and the 99th percentile of a 5 ms heartbeat on the GUI
// thread during each fill, while a node of 20,000 children opens, during tree searches and
// while the level page reads a level of every class (and as many absent); and how the
// family tree grows at four times the classes. Figures taken on a busy machine include the
// time the scheduler gave to other processes.
//
// bench_treepages [--modules N] [--classes N] [--settings N] [--runs N] [--scale N]

#include "DeviceWindow.h"
#include "FamilyTreeView.h"
#include "GuiHeartbeat.h"
#include "ISettingsTreeView.h"
#include "IdFormat.h"
#include "LevelViewWidget.h"
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
#include <QTimer>
#include <QTreeWidgetItemIterator>
#include <QXmlStreamWriter>

#include <algorithm>
#include <cstdio>
#include <functional>
#include <memory>

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
    qint64 readyMs = 0;
    qint64 longest = 0;
    qint64 p99 = 0;
    qint64 longestCpu = 0;
};

// Runs start, then the event loop until page is complete or failed, with the heartbeat on.
Gaps fill(GatewayComponentWidget* page, const std::function<void()>& start)
{
    GuiHeartbeat heartbeat;
    QEventLoop loop;
    QObject::connect(page, &GatewayComponentWidget::stateChanged, &loop, [&](GatewayComponentWidget::ComponentState state) {
        if (state == GatewayComponentWidget::Complete || state == GatewayComponentWidget::Failed)
            loop.quit();
    });
    QElapsedTimer sinceStart;
    sinceStart.start();
    heartbeat.start();
    start();
    if (page->state() != GatewayComponentWidget::Complete)
        loop.exec();
    Gaps gaps;
    gaps.readyMs = sinceStart.elapsed();
    heartbeat.stop();
    gaps.longest = heartbeat.longest();
    gaps.p99 = heartbeat.p99();
    gaps.longestCpu = heartbeat.cpuOfLongest();
    return gaps;
}

// An action on the GUI thread as the user meets it: queued, then the event loop for 300 ms
// more, its repaints included.
Gaps during(const std::function<void()>& action)
{
    GuiHeartbeat heartbeat;
    QEventLoop loop;
    heartbeat.start();
    QElapsedTimer took;
    QTimer::singleShot(20, [&] {
        took.start();
        action();
        QTimer::singleShot(300, &loop, &QEventLoop::quit);
    });
    loop.exec();
    heartbeat.stop();
    return {took.elapsed() - 300, heartbeat.longest(), heartbeat.p99(), heartbeat.cpuOfLongest()};
}

void printGaps(const QString& what, const QVector<Gaps>& runs)
{
    QVector<qint64> longest;
    QVector<qint64> cpu;
    QVector<qint64> p99;
    for (const Gaps& gaps : runs) {
        longest.append(gaps.longest);
        cpu.append(gaps.longestCpu);
        p99.append(gaps.p99);
    }
    out() << QStringLiteral("  %1: longest GUI gap %2 ms (%3 ms of it CPU), p99 %4 ms (targets <= 33 ms, <= 16 ms)\n")
                 .arg(what).arg(median(longest)).arg(median(cpu)).arg(median(p99));
    out().flush();
}

QVector<qint64> readyTimes(const QVector<Gaps>& runs)
{
    QVector<qint64> times;
    for (const Gaps& gaps : runs)
        times.append(gaps.readyMs);
    return times;
}

// The median wall time of "delvix-cli command device", its output thrown away.
qint64 cliMs(const QString& command, const QString& device, int runs)
{
    QVector<qint64> times;
    for (int run = 0; run < runs; ++run) {
        QProcess cli;
        cli.setStandardOutputFile(QProcess::nullDevice());
        QElapsedTimer took;
        took.start();
        cli.start(QCoreApplication::applicationDirPath() + QStringLiteral("/delvix-cli"), {command, device});
        if (!cli.waitForFinished(-1) || cli.exitCode() != 0)
            return -1;
        times.append(took.elapsed());
    }
    return median(times);
}

// A level file that asks for every class of the device and for as many it lacks.
bool writeFullLevel(const QString& path, const IdRecordMap& classes)
{
    QFile file(path);
    if (!file.open(QIODevice::WriteOnly))
        return false;
    QXmlStreamWriter xml(&file);
    xml.setAutoFormatting(true);
    xml.writeStartElement(QStringLiteral("level"));
    const auto writeId = [&xml](const QString& id, const QString& name) {
        xml.writeEmptyElement(QStringLiteral("Id"));
        xml.writeAttribute(QStringLiteral("value"), id);
        xml.writeAttribute(QStringLiteral("name"), name);
    };
    quint32 absent = 0x6E000000;
    for (const IdRecord& record : classes) {
        writeId(record.id, record.name);
        writeId(formatId(++absent), QStringLiteral("Absent"));
    }
    xml.writeEndElement();
    return file.flush();
}

QTreeWidgetItem* largestNode(QTreeWidget* tree)
{
    QTreeWidgetItem* largest = nullptr;
    for (QTreeWidgetItemIterator it(tree); *it; ++it) {
        if (!largest || (*it)->childCount() > largest->childCount())
            largest = *it;
    }
    return largest;
}

// The family tree of device, runs times: its time to "Ready" and gaps, the statuses it
// showed; the last page stays for what follows.
QVector<Gaps> familyTreeRuns(const DeviceCache* record, int runs, std::unique_ptr<FamilyTreeView>& kept, QStringList& statuses)
{
    QVector<Gaps> results;
    for (int run = 0; run < runs; ++run) {
        kept = std::make_unique<FamilyTreeView>();
        kept->resize(900, 600);
        kept->show();
        statuses.clear();
        QObject::connect(kept.get(), &GatewayComponentWidget::statusChanged, [&statuses](const QString& status) {
            statuses.append(status);
        });
        results.append(fill(kept.get(), [&] { kept->setDeviceRecord(record); }));
    }
    return results;
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
    options.addOption({QStringLiteral("settings"), QStringLiteral("settings nodes of the image"), QStringLiteral("N"), QStringLiteral("20000")});
    options.addOption({QStringLiteral("runs"), QStringLiteral("runs of each fill"), QStringLiteral("N"), QStringLiteral("3")});
    options.addOption({QStringLiteral("scale"), QStringLiteral("times the classes of the growth run (0: none)"), QStringLiteral("N"), QStringLiteral("4")});
    options.process(app);
    const int modules = options.value(QStringLiteral("modules")).toInt();
    const int classes = options.value(QStringLiteral("classes")).toInt();
    const int settings = options.value(QStringLiteral("settings")).toInt();
    const int runs = std::max(1, options.value(QStringLiteral("runs")).toInt());
    const int scale = options.value(QStringLiteral("scale")).toInt();

    QProcess server;
    const QSharedPointer<_ZantDevice> device = serveGeneratedDevice(server, work, modules, classes, settings);
    if (!device)
        return 1;
    out() << QStringLiteral("image: %1 modules, %2 classes, %3 settings nodes; peak memory before the pages: %4 MB\n")
                 .arg(modules).arg(device->cache()->classes.size()).arg(settings).arg(peakMemoryMb());

    std::unique_ptr<FamilyTreeView> family;
    QStringList statuses;
    const QVector<Gaps> familyFills = familyTreeRuns(device->cache().data(), runs, family, statuses);
    const qint64 familyMs = median(readyTimes(familyFills));
    out() << QStringLiteral("family tree: ready after %1 ms (median of %2; target <= 1000 ms), delvix-cli family-tree %3 ms\n")
                 .arg(familyMs).arg(runs).arg(cliMs(QStringLiteral("family-tree"), DeviceId, runs));
    out() << QStringLiteral("  %1 statuses, the last three: %2\n")
                 .arg(statuses.size()).arg(statuses.mid(std::max(0, int(statuses.size()) - 3)).join(QStringLiteral(" / ")));
    printGaps(QStringLiteral("during the fill"), familyFills);
    QTreeWidgetItem* largest = largestNode(family->_familyTree);
    out() << QStringLiteral("  largest node: %1 children\n").arg(largest ? largest->childCount() : 0);
    QVector<Gaps> expands;
    for (int run = 0; run < runs && largest; ++run) {
        for (QTreeWidgetItem* up = largest->parent(); up; up = up->parent())
            up->setExpanded(true);
        QCoreApplication::processEvents();
        expands.append(during([&] { largest->setExpanded(true); }));
        largest->setExpanded(false);
        family->_familyTree->collapseAll();
        QCoreApplication::processEvents();
    }
    printGaps(QStringLiteral("opening the largest node"), expands);
    for (const QString& text : {QStringLiteral("4E2"), QStringLiteral("not")}) {
        QVector<Gaps> searches;
        for (int run = 0; run < runs; ++run)
            searches.append(during([&] { family->search(text); }));
        printGaps(QStringLiteral("search \"%1\", %2 items selected").arg(text).arg(family->_familyTree->selectedItems().size()),
                  searches);
    }
    family.reset();
    out() << QStringLiteral("  peak memory so far: %1 MB\n").arg(peakMemoryMb());

    {
        DeviceWindow window;
        window.setAttribute(Qt::WA_DeleteOnClose, false);
        window.show();
        const Gaps inWindow = fill(window._familyTreeView, [&] {
            window.setDevice(DeviceId);
            window.action_Family_Tree->trigger();
        });
        out() << QStringLiteral("family tree in a device window, beside the class list: ready after %1 ms\n").arg(inWindow.readyMs);
        printGaps(QStringLiteral("during the window's fill"), {inWindow});
    }

    QVector<Gaps> settingsFills;
    for (int run = 0; run < runs; ++run) {
        ISettingsTreeView page;
        page.resize(900, 600);
        page.show();
        settingsFills.append(fill(&page, [&] { page.startComponent(DeviceId); }));
        if (run == runs - 1)
            out() << QStringLiteral("settings tree: status \"%1\", %2 top-level nodes\n").arg(page.status()).arg(page._settingsTree->topLevelItemCount());
    }
    out() << QStringLiteral("  ready after %1 ms (median of %2; target <= 1500 ms), delvix-cli settings %3 ms\n")
                 .arg(median(readyTimes(settingsFills))).arg(runs).arg(cliMs(QStringLiteral("settings"), DeviceId, runs));
    printGaps(QStringLiteral("during the fill"), settingsFills);

    {
        LevelViewWidget page;
        page.resize(900, 600);
        page.show();
        page.setDeviceRecord(device->cache().data());
        const QString fullLevel = work.filePath(QStringLiteral("Everything.xml"));
        if (!writeFullLevel(fullLevel, device->cache()->classes)) {
            std::fprintf(stderr, "cannot write %s\n", qPrintable(fullLevel));
            return 1;
        }
        page._levelDocuments->addItem(QStringLiteral("Everything"), fullLevel);
        for (int index = 1; index < page._levelDocuments->count(); ++index) {
            QVector<Gaps> reads;
            for (int run = 0; run < runs; ++run) {
                page._levelDocuments->setCurrentIndex(0);
                reads.append(fill(&page, [&] { page._levelDocuments->setCurrentIndex(index); }));
            }
            int items = 0;
            for (QTreeWidgetItemIterator it(page._level1Tree); *it; ++it)
                ++items;
            out() << QStringLiteral("level page, \"%1\": %2 tree items, shown after %3 ms\n")
                         .arg(page._levelDocuments->itemText(index)).arg(items).arg(median(readyTimes(reads)));
            printGaps(QStringLiteral("during the read"), reads);
        }
    }

    if (scale > 1) {
        QProcess largeServer;
        const QString largeId = QStringLiteral("bench-x%1").arg(scale);
        const QSharedPointer<_ZantDevice> large = serveGeneratedDevice(largeServer, work, modules, classes * scale, 0, largeId);
        if (!large)
            return 1;
        const QVector<Gaps> largeFills = familyTreeRuns(large->cache().data(), runs, family, statuses);
        family.reset();
        const qint64 largeMs = median(readyTimes(largeFills));
        out() << QStringLiteral("family tree at %1 classes: ready after %2 ms, %3x the time at %4 (target <= 4.5x)\n")
                     .arg(large->cache()->classes.size()).arg(largeMs)
                     .arg(double(largeMs) / double(std::max<qint64>(1, familyMs)), 0, 'f', 2).arg(classes);
        printGaps(QStringLiteral("during the fill"), largeFills);
        largeServer.terminate();
        largeServer.waitForFinished();
    }
    out() << QStringLiteral("peak memory: %1 MB\n").arg(peakMemoryMb());
    out().flush();

    Portlex::Destroy();
    server.terminate();
    server.waitForFinished();
    return 0;
}
