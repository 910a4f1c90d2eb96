#include "LivePollThread.h"
#include "LoadedModuleView.h"
#include "PageFixtures.h"
#include "Portlex.h"
#include "ProcessView.h"
#include "SimulatorProcess.h"
#include "TestSupport.h"
#include "_ZantDevice.h"

#include <QSignalSpy>
#include <QTemporaryDir>

#include <functional>
#include <memory>

using namespace PageFixtures;

namespace {

using Page = LiveTreePage;

const QByteArray Still = "<processes evolve=\"no\" interval=\"100\">\n"
                         " <process name=\"Kernel\"><thread name=\"idle\" priority=\"0\" state=\"1\"/>\n"
                         "  <thread name=\"odd\" priority=\"5\" state=\"7\"/>\n"
                         "  <module name=\"k.bin\" location=\"/sys/k.bin\" size=\"0\"/></process>\n"
                         "</processes>\n";
// Shell's threads come and go, and its viewer is loaded and unloaded, every 150 ms.
const QByteArray Evolving = "<processes evolve=\"yes\" seed=\"5\" interval=\"150\" max=\"1\">\n"
                            " <process name=\"Shell\"><thread name=\"ui\" priority=\"160\" state=\"1\"/>\n"
                            "  <module name=\"shell.mod\" location=\"/sys/shell.mod\" size=\"14336\"/>\n"
                            "  <module name=\"viewer.mod\" location=\"/sys/viewer.mod\" size=\"8192\" onDemand=\"yes\"/>\n"
                            " </process>\n"
                            "</processes>\n";
const QByteArray Empty = "<processes evolve=\"no\"/>\n";

// An image with the given processes and a runnable module /usermod/app/app.mod.
bool writeImage(const QString& folder, const QByteArray& processes)
{
    const QDir image(folder);
    return TestSupport::writeFile(image.filePath("device.xml"),
                                  "<device id=\"live\" name=\"Live\" connection=\"simulator\">\n"
                                  " <identity phoneName=\"Live\" targetId=\"0x0A110042\" zantVersion=\"3.2.9\"/>\n"
                                  + processes
                                  + " <volume id=\"1\" name=\"Flash\" mount=\"/\" folder=\"flash\" size=\"16777216\" modules=\"usermod\"/>\n"
                                    "</device>\n")
        && TestSupport::writeFile(image.filePath("flash/usermod/app/app.mod"), "module");
}

std::unique_ptr<Page> makePage(bool threads)
{
    if (threads)
        return std::make_unique<ProcessView>();
    return std::make_unique<LoadedModuleView>();
}

QTreeWidget* treeOf(Page& page)
{
    return page.findChild<QTreeWidget*>();
}

// A row's life as one text: its state, its age while it counts, and its colour.
QString life(const QTreeWidgetItem* row)
{
    const int column = row->type() == Page::ProcessType ? Page::ProcessColumn : Page::EntryColumn;
    const QColor colour = row->foreground(column).color();
    const QString colourName = colour == QColor(Qt::darkGreen) ? "green" : colour == QColor(Qt::red) ? "red"
                                                                   : colour == QColor(Qt::black) ? "black" : colour.name();
    const int state = row->data(0, Page::StateRole).toInt();
    if (state == Page::Shown)
        return "shown " + colourName;
    return (state == Page::New ? "new " : state == Page::Gone ? "gone " : "state? ")
        + row->data(0, Page::AgeRole).toString() + " " + colourName;
}

// The lives of every row, depth-first.
QStringList lives(QTreeWidget* tree)
{
    QStringList all;
    for (QTreeWidgetItemIterator it(tree); *it; ++it)
        all.append(life(*it));
    return all;
}

QList<QTreeWidgetItem*> rowsNamed(QTreeWidget* tree, int column, const QString& name)
{
    return tree->findItems(name, Qt::MatchExactly | Qt::MatchRecursive, column);
}

void tick(Page& page, int times)
{
    for (int i = 0; i < times; ++i)
        page.onTimeElapse();
}

// Ticks a gone row to its end by hand: it stays up to its fifth tick and goes at the sixth.
// The row is looked up again by id after every tick, as a tick may delete it.
bool ticksToRemoval(Page& page, QTreeWidgetItem* row)
{
    QTreeWidget* tree = treeOf(page);
    const QVariant id = row->data(0, Page::IdRole);
    const int type = row->type();
    const auto present = [&] {
        for (QTreeWidgetItemIterator it(tree); *it; ++it) {
            if ((*it)->type() == type && (*it)->data(0, Page::IdRole) == id && (*it)->data(0, Page::StateRole) == Page::Gone)
                return *it;
        }
        return static_cast<QTreeWidgetItem*>(nullptr);
    };
    tick(page, Page::AgingTicks - row->data(0, Page::AgeRole).toInt());
    QTreeWidgetItem* last = present();
    if (!last || last->data(0, Page::AgeRole).toInt() != Page::AgingTicks)
        return false;
    page.onTimeElapse();
    return !present();
}

struct Thread
{
    quint32 id;
    quint32 state;
};

QVector<ProcessInfo> processes(const QVector<QPair<quint32, QVector<Thread>>>& list, const QString& name = "p")
{
    QVector<ProcessInfo> result;
    for (const auto& process : list) {
        ProcessInfo info{name, process.first, {}};
        for (const Thread& thread : process.second)
            info.threads.append(ThreadEntry{name + QString::number(thread.id), thread.id, 100, thread.state, process.first, 0});
        result.append(info);
    }
    return result;
}

int threadCount()
{
    return QDir("/proc/self/task").entryList(QDir::Dirs | QDir::NoDotAndDotDot).size();
}

} // namespace

// The threads and loaded modules pages, live on real simulators: a still device where the
// test starts applications, one whose threads and modules change by themselves, an empty one
// and a failing one.
class TestLivePages : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase()
    {
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        QVERIFY(Portlex::Initialize());
        for (const auto& [folder, processes] : {std::pair{&m_stillImage, Still}, {&m_evolvingImage, Evolving},
                                                {&m_emptyImage, Empty}})
            QVERIFY(writeImage(folder->path(), processes));
        m_device = m_still.connectDevice(m_stillImage.path(), "still", {"--run-lifetime", "2500"});
        QVERIFY(m_device);
        QVERIFY(m_evolving.connectDevice(m_evolvingImage.path(), "evolving"));
        QVERIFY(m_empty.connectDevice(m_emptyImage.path(), "empty"));
        QVERIFY(m_failing.connectDevice(m_stillImage.path(), "failing", {"--fail", "GetProcesses=5", "--fail", "GetLoadedModules=7"}));
    }

    void cleanupTestCase()
    {
        m_device.reset();
        Portlex::Destroy();
    }

    // Only ids count: names, states and priorities may change without a merge; another
    // process id, thread id or count is a change.
    void listsCompareByIds_data()
    {
        QTest::addColumn<QVector<ProcessInfo>>("fresh");
        QTest::addColumn<bool>("same");
        QTest::newRow("identical") << processes({{10, {{11, 1}, {12, 2}}}, {20, {}}}) << true;
        QTest::newRow("thread state and names") << processes({{10, {{11, 3}, {12, 0}}}, {20, {}}}, "q") << true;
        QTest::newRow("thread id") << processes({{10, {{11, 1}, {13, 2}}}, {20, {}}}) << false;
        QTest::newRow("process id") << processes({{10, {{11, 1}, {12, 2}}}, {21, {}}}) << false;
        QTest::newRow("thread more") << processes({{10, {{11, 1}, {12, 2}}}, {20, {{21, 1}}}}) << false;
        QTest::newRow("process less") << processes({{10, {{11, 1}, {12, 2}}}}) << false;
    }

    void listsCompareByIds()
    {
        QFETCH(QVector<ProcessInfo>, fresh);
        QFETCH(bool, same);
        const QVector<ProcessInfo> held = processes({{10, {{11, 1}, {12, 2}}}, {20, {}}});
        QCOMPARE(sameIds(held, fresh, &ProcessInfo::threads), same);
        LiveSnapshot<ProcessInfo> snapshot;
        const auto byIds = [](const QVector<ProcessInfo>& a, const QVector<ProcessInfo>& b) {
            return sameIds(a, b, &ProcessInfo::threads);
        };
        QVERIFY(snapshot.offer(held, byIds));
        QVector<ProcessInfo> taken;
        QVERIFY(snapshot.take(taken) && !snapshot.take(taken));
        QCOMPARE(snapshot.offer(fresh, byIds), !same);
        QCOMPARE(snapshot.take(taken), !same);
        QCOMPARE(taken, same ? held : fresh);
    }

    // New rows are green for five ticks and black at the sixth; two pages of one device age
    // on their own; an application that ends leaves a gone row beside the row of its next
    // run, and the gone row goes at its sixth tick.
    void rowsAgeThroughTheTick()
    {
        ProcessView page, other;
        LoadedModuleView modules;
        for (Page* each : std::initializer_list<Page*>{&page, &other, &modules}) {
            each->startComponent("still");
            QVERIFY(tickUntil(*each, [&] { return treeOf(*each)->topLevelItemCount() == 1; }));
        }
        QCOMPARE(treeLines(page._processTree),
                 QStringList({"Kernel||1000||", " |idle|1001|Default|0", " |odd|1002|Unknown:7|5"}));
        QCOMPARE(treeLines(modules._loadedModuleTree), QStringList({"Kernel|||", " |k.bin|0|/sys/k.bin"}));
        QCOMPARE(lives(page._processTree), QStringList(3, "new 1 green"));
        tick(page, 4);
        QCOMPARE(lives(page._processTree), QStringList(3, "new 5 green"));
        page.onTimeElapse();
        QCOMPARE(lives(page._processTree), QStringList(3, "shown black"));
        QCOMPARE(lives(other._processTree), QStringList(3, "new 1 green"));
        QCOMPARE(page.status(), QString("Ready"));
        QCOMPARE(page.state(), GatewayComponentWidget::Complete);

        QCOMPARE(m_device->RunApplication("/usermod/app/app.mod"), 0);
        QTRY_VERIFY(!rowsNamed(page._processTree, ProcessView::ProcessNameColumn, "app").isEmpty());
        QTreeWidgetItem* first = rowsNamed(page._processTree, ProcessView::ProcessNameColumn, "app").first();
        QVERIFY(life(first).startsWith("new"));
        QStringList threads;
        for (int i = 0; i < first->childCount(); ++i)
            threads << first->child(i)->text(ProcessView::ThreadNameColumn) + " " + life(first->child(i)).section(' ', 0, 0);
        QCOMPARE(threads, QStringList({"app::Main new", "app::UI new", "app::Timer new"}));

        QTRY_VERIFY_WITH_TIMEOUT(life(first).startsWith("gone"), 10000);
        QCOMPARE(first->childCount(), 3);
        QCOMPARE(m_device->RunApplication("/usermod/app/app.mod"), 0);
        QTRY_COMPARE(rowsNamed(page._processTree, ProcessView::ProcessNameColumn, "app").size(), 2);
        const QList<QTreeWidgetItem*> runs = rowsNamed(page._processTree, ProcessView::ProcessNameColumn, "app");
        QTreeWidgetItem* second = runs.at(runs.first() == first ? 1 : 0);
        QVERIFY(second->text(ProcessView::IdColumn).toUInt() > first->text(ProcessView::IdColumn).toUInt());
        QVERIFY(life(second).startsWith("new") && life(first).startsWith("gone"));
        QVERIFY(ticksToRemoval(page, first));
        QCOMPARE(rowsNamed(page._processTree, ProcessView::ProcessNameColumn, "app"), QList<QTreeWidgetItem*>({second}));
    }

    // Threads and modules of a running process come and go: a new one is green, a vanished one
    // turns red and goes at its sixth tick.
    void entriesComeAndGo_data()
    {
        QTest::addColumn<bool>("threads");
        QTest::newRow("threads") << true;
        QTest::newRow("loaded modules") << false;
    }

    void entriesComeAndGo()
    {
        QFETCH(bool, threads);
        const std::unique_ptr<Page> page = makePage(threads);
        page->startComponent("evolving");
        QTreeWidget* tree = treeOf(*page);
        QVERIFY(tickUntil(*page, [&] { return tree->topLevelItemCount() == 1; }));
        QTreeWidgetItem* shell = tree->topLevelItem(0);
        quint32 highest = 0;
        for (int i = 0; i < shell->childCount(); ++i)
            highest = std::max(highest, shell->child(i)->data(0, Page::IdRole).toUInt());
        const auto find = [&](const std::function<bool(QTreeWidgetItem*)>& match) {
            for (int i = 0; i < shell->childCount(); ++i) {
                if (match(shell->child(i)))
                    return shell->child(i);
            }
            return static_cast<QTreeWidgetItem*>(nullptr);
        };
        QTRY_VERIFY_WITH_TIMEOUT(find([&](QTreeWidgetItem* row) { return row->data(0, Page::IdRole).toUInt() > highest; }), 15000);
        const QTreeWidgetItem* added = find([&](QTreeWidgetItem* row) { return row->data(0, Page::IdRole).toUInt() > highest; });
        QVERIFY2(life(added).startsWith("new") && life(added).endsWith("green"), qPrintable(life(added)));
        QCOMPARE(added->text(1), threads ? QString("ui worker") : QString("viewer.mod"));
        if (!threads)
            QCOMPARE(QStringList({added->text(2), added->text(3)}), QStringList({"8192", "/sys/viewer.mod"}));

        QTRY_VERIFY_WITH_TIMEOUT(find([](QTreeWidgetItem* row) { return life(row).startsWith("gone"); }), 15000);
        QTreeWidgetItem* gone = find([](QTreeWidgetItem* row) { return life(row).startsWith("gone"); });
        QVERIFY2(life(gone).endsWith("red"), qPrintable(life(gone)));
        QVERIFY(ticksToRemoval(*page, gone));
    }

    // The statuses a page ends at, and whether its worker still polls: an empty device is
    // ready without ever updating; a failed poll ends the worker and its error stays; an
    // unknown device starts nothing.
    void statusesAndFailures_data()
    {
        QTest::addColumn<bool>("threads");
        QTest::addColumn<QString>("device");
        QTest::addColumn<QString>("status");
        QTest::addColumn<GatewayComponentWidget::ComponentState>("state");
        QTest::addColumn<bool>("polling");
        QTest::newRow("empty device") << true << "empty" << "Ready" << GatewayComponentWidget::Complete << true;
        QTest::newRow("empty device, modules") << false << "empty" << "Ready" << GatewayComponentWidget::Complete << true;
        QTest::newRow("failing threads") << true << "failing" << "Error: 5" << GatewayComponentWidget::Failed << false;
        QTest::newRow("failing modules") << false << "failing" << "Error: 7" << GatewayComponentWidget::Failed << false;
        QTest::newRow("unknown device") << true << "nowhere" << "Device not found" << GatewayComponentWidget::Starting << false;
    }

    void statusesAndFailures()
    {
        QFETCH(bool, threads);
        QFETCH(QString, device);
        QFETCH(QString, status);
        QFETCH(GatewayComponentWidget::ComponentState, state);
        QFETCH(bool, polling);
        const std::unique_ptr<Page> page = makePage(threads);
        QSignalSpy statuses(page.get(), &GatewayComponentWidget::statusChanged);
        page->startComponent(device);
        QVERIFY(tickUntil(*page, [&] { return page->status() == status && page->isPolling() == polling; }));
        tick(*page, 3);
        QCOMPARE(page->status(), status);
        QCOMPARE(page->state(), state);
        QCOMPARE(page->isPolling(), polling);
        QCOMPARE(treeOf(*page)->topLevelItemCount(), 0);
        QVERIFY(!signalTexts(statuses).filter("Updating").size());
    }

    // A page closed while its poll hangs on a stopped device: the close returns, and the
    // worker, once its call has timed out, ends without reporting to the page that is gone.
    void closedWhilePollHangs()
    {
        const int threads = threadCount();
        auto page = std::make_unique<ProcessView>();
        m_empty.pause();
        page->startComponent("empty");
        QTRY_COMPARE(page->status(), QString("Querying Device Processes"));
        page.reset();
        m_empty.resume();
        QTRY_COMPARE_WITH_TIMEOUT(threadCount(), threads, 15000);
    }

private:
    QTemporaryDir m_sockets;
    QTemporaryDir m_stillImage;
    QTemporaryDir m_evolvingImage;
    QTemporaryDir m_emptyImage;
    SimulatorProcess m_still{m_sockets.path()};
    SimulatorProcess m_evolving{m_sockets.path()};
    SimulatorProcess m_empty{m_sockets.path()};
    SimulatorProcess m_failing{m_sockets.path()};
    QSharedPointer<_ZantDevice> m_device;
};

QTEST_MAIN(TestLivePages)
#include "tst_livepages.moc"
