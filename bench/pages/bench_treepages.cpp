// Fills the family tree and level pages from a generated image (10,000 modules and 20,000
// classes unless told otherwise) served by a real simulator, and prints for each page: the
// time from its start to "Ready", the longest gap of a 5 ms heartbeat on the GUI thread
// meanwhile, the time of three-character searches over the full tree, and the process's
// peak memory. The family tree is measured alone and inside a device window, where the class
// id list fills beside it; the level page with a shipped level and with one that lists
// every class of the image.
//
// bench_treepages [--modules N] [--classes N]

#include "DeviceWindow.h"
#include "FamilyTreeView.h"
#include "FamilyTreeViewThread.h"
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
#include <QThread>
#include <QTimer>
#include <QTreeWidgetItemIterator>
#include <QXmlStreamWriter>


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

enum class StartCounts
{
    AsFill, // start fills the page itself
    Not     // start only sets things going (building a window): the gaps after it count
};

// What a fill took: its time to completion and the longest gap between two beats of a 5 ms
// timer meanwhile, with the time the gap ended (both from the start).
struct Fill
{
    qint64 readyMs = 0;
    qint64 gapMs = 0;
    qint64 gapEndMs = 0;
};

// Runs start, then the event loop until page is complete.
Fill runWithHeartbeat(GatewayComponentWidget* page, const std::function<void()>& start, StartCounts counts)
{
    Fill fill;
    QElapsedTimer sinceStart;
    QElapsedTimer sinceBeat;
    const auto beat = [&] {
        const qint64 gap = sinceBeat.restart();
        if (gap > fill.gapMs) {
            fill.gapMs = gap;
            fill.gapEndMs = sinceStart.elapsed();
        }
    };
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
    sinceStart.start();
    sinceBeat.start();
    heartbeat.start();
    start();
    if (counts == StartCounts::Not)
        sinceBeat.restart();
    if (page->state() != GatewayComponentWidget::Complete)
        loop.exec();
    fill.readyMs = sinceStart.elapsed();
    // One more beat, so a block at the very end counts too.
    QTimer::singleShot(0, &loop, &QEventLoop::quit);
    loop.exec();
    beat();
    return fill;
}

int selectedItems(const QTreeWidget* tree)
{
    return int(tree->selectedItems().size());
}

// A search as the user sees it: the call and the repaint that follows.
void timeSearch(GatewayComponentWidget* page, QTreeWidget* tree, const QString& text)
{
    QElapsedTimer timer;
    timer.start();
    page->search(text);
    QCoreApplication::processEvents();
    const qint64 ms = timer.elapsed();
    out() << QStringLiteral("  search \"%1\": %2 ms, %3 items selected (target < 150 ms)\n")
                 .arg(text).arg(ms).arg(selectedItems(tree));
}

int countItems(QTreeWidget* tree)
{
    int items = 0;
    for (QTreeWidgetItemIterator it(tree); *it; ++it)
        ++items;
    return items;
}

void report(const QString& name, GatewayComponentWidget* page, QTreeWidget* tree, const Fill& fill,
            const QString& target, const QStringList& searches)
{
    out() << name << QStringLiteral(": %1 tree items, status \"%2\"\n").arg(countItems(tree)).arg(page->status());
    out() << QStringLiteral("  ready after %1 ms (%2)\n").arg(fill.readyMs).arg(target);
    out() << QStringLiteral("  longest GUI gap: %1 ms, ending %2 ms after the start (target < 50 ms)\n")
                 .arg(fill.gapMs)
                 .arg(fill.gapEndMs);
    for (const QString& text : searches)
        timeSearch(page, tree, text);
    timeSearch(page, tree, QStringLiteral("ab"));
    out() << QStringLiteral("  peak memory so far: %1 MB\n").arg(peakMemoryMb());
    out().flush();
}

QString pacingTarget(qint64 readyMs, int classes)
{
    // The pacing: the first tick after 500 ms, then one class per worker step.
    const qint64 pacing = FamilyTreeView::FirstTickMs + qint64(classes) * qint64(FamilyTreeViewThread::StepMs);
    return QStringLiteral("pacing %1 ms, ratio %2, target <= 1.2")
        .arg(pacing)
        .arg(double(readyMs) / double(pacing), 0, 'f', 3);
}

} // namespace

int main(int argc, char** argv)
{
    if (qEnvironmentVariableIsEmpty("QT_QPA_PLATFORM"))
        qputenv("QT_QPA_PLATFORM", "offscreen");
    QApplication app(argc, argv);
    QCommandLineParser options;
    options.addHelpOption();
    options.addOption({QStringLiteral("modules"), QStringLiteral("modules of the image"), QStringLiteral("N"), QStringLiteral("10000")});
    options.addOption({QStringLiteral("classes"), QStringLiteral("classes of the image"), QStringLiteral("N"), QStringLiteral("20000")});
    options.process(app);
    const int modules = options.value(QStringLiteral("modules")).toInt();
    const int classes = options.value(QStringLiteral("classes")).toInt();

    QTemporaryDir work;
    QProcess server;
    const QSharedPointer<_ZantDevice> device = serveGeneratedDevice(server, work, modules, classes);
    if (!device)
        return 1;
    const int known = int(device->cache()->classes.size());
    out() << QStringLiteral("image: %1 modules, %2 classes; peak memory before the pages: %3 MB\n")
                 .arg(modules).arg(known).arg(peakMemoryMb());
    const QStringList treeSearches = {QStringLiteral("4E2"), QStringLiteral("not")};

    {
        FamilyTreeView page;
        page.resize(900, 600);
        page.show();
        const Fill fill = runWithHeartbeat(&page, [&] { page.setDeviceRecord(device->cache().data()); }, StartCounts::Not);
        report(QStringLiteral("family tree, alone"), &page, page._familyTree, fill, pacingTarget(fill.readyMs, known),
               treeSearches);
    }
    {
        DeviceWindow window;
        window.setAttribute(Qt::WA_DeleteOnClose, false);
        window.show();
        const Fill fill = runWithHeartbeat(window._familyTreeView, [&] {
            window.setDevice(DeviceId);
            window.action_Family_Tree->trigger();
        }, StartCounts::Not);
        report(QStringLiteral("family tree, in a device window"), window._familyTreeView,
               window._familyTreeView->_familyTree, fill, pacingTarget(fill.readyMs, known), treeSearches);
    }
    {
        DeviceWindow window;
        window.setAttribute(Qt::WA_DeleteOnClose, false);
        window.setDevice(DeviceId);
        window.show();
        window._actionLevelView->trigger();
        LevelViewWidget* page = window._levelViewWidget;
        const QString fullLevel = work.filePath(QStringLiteral("Everything.xml"));
        if (!writeFullLevel(fullLevel, device->cache()->classes)) {
            std::fprintf(stderr, "cannot write %s\n", qPrintable(fullLevel));
            return 1;
        }
        page->_levelDocuments->addItem(QStringLiteral("Everything"), fullLevel);
        const int stress = page->_levelDocuments->count() - 1;
        for (int index = 1; index <= stress; ++index) {
            const Fill fill = runWithHeartbeat(page, [&] { page->_levelDocuments->setCurrentIndex(index); },
                                               StartCounts::AsFill);
            // The page reads a level on the GUI thread, all at once; the stress level is far
            // beyond any shipped one and shows how that scales.
            const QString kind = index == stress ? QStringLiteral("stress level, read on the GUI thread at once")
                                                 : QStringLiteral("shipped level, read on the GUI thread at once");
            report(QStringLiteral("level page, \"%1\"").arg(page->_levelDocuments->itemText(index)), page,
                   page->_level1Tree, fill, kind, treeSearches);
        }
    }

    Portlex::Destroy();
    server.terminate();
    server.waitForFinished();
    return 0;
}
