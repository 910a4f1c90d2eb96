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

#include <memory>

using namespace PageFixtures;

namespace {

using Page = LiveTreePage;

// Kernel stays; /usermod/app/app.mod can be run. On "evolving", Shell's threads come and go,
// and its viewer is loaded and unloaded, every 150 ms.
const QByteArray Still = "<processes evolve='no' interval='100'><process name='Kernel'>"
                         "<thread name='idle' priority='0' state='1'/><thread name='odd' priority='5' state='7'/>"
                         "<module name='k.bin' location='/sys/k.bin' size='0'/></process></processes>";
const QByteArray Evolving = "<processes evolve='yes' seed='5' interval='150' max='1'><process name='Shell'>"
                            "<thread name='ui' priority='160' state='1'/><module name='shell.mod' location='/sys/shell.mod'"
                            " size='14336'/><module name='viewer.mod' location='/sys/viewer.mod' size='8192' onDemand='yes'/>"
                            "</process></processes>";

bool writeImage(const QString& folder, const QByteArray& processes)
{
    return TestSupport::writeFile(folder + "/device.xml",
                                  "<device id='live' name='Live' connection='simulator'><identity phoneName='Live'"
                                  " targetId='0x0A110042' zantVersion='3.2.9'/>" + processes
                                  + "<volume id='1' name='Flash' mount='/' folder='flash' size='16777216'/></device>")
        && TestSupport::writeFile(folder + "/flash/usermod/app/app.mod", "module");
}

std::unique_ptr<Page> makePage(bool threads)
{
    return threads ? std::unique_ptr<Page>(new ProcessView) : std::unique_ptr<Page>(new LoadedModuleView);
}

QTreeWidget* treeOf(Page& page)
{
    return page.findChild<QTreeWidget*>();
}

// A row's life as one text: its state, its age while it counts, and its colour.
QString life(const QTreeWidgetItem* row)
{
    const QColor colour = row->foreground(row->type() == Page::ProcessType ? Page::ProcessColumn : Page::EntryColumn).color();
    const QString name = colour == Qt::darkGreen ? "green" : colour == Qt::red ? "red" : colour == Qt::black ? "black" : colour.name();
    const int state = row->data(0, Page::StateRole).toInt();
    const QString age = state == Page::Shown ? QString() : row->data(0, Page::AgeRole).toString() + " ";
    return QStringList({"?", "shown", "new", "gone"}).value(state) + " " + age + name;
}

QStringList lives(QTreeWidget* tree)
{
    QStringList all;
    for (QTreeWidgetItemIterator it(tree); *it; ++it)
        all.append(life(*it));
    return all;
}

QList<QTreeWidgetItem*> appRows(QTreeWidget* tree)
{
    return tree->findItems("app", Qt::MatchExactly, ProcessView::ProcessNameColumn);
}

void tick(Page& page, int times)
{
    for (int i = 0; i < times; ++i)
        page.onTimeElapse();
}

// Ticks a gone row by hand: it is still there at its fifth tick and gone at the sixth.
bool ticksToRemoval(Page& page, QTreeWidgetItem* row)
{
    tick(page, Page::AgingTicks - row->data(0, Page::AgeRole).toInt());
    const bool lastTick = row->data(0, Page::AgeRole).toInt() == Page::AgingTicks;
    page.onTimeElapse();
    QTreeWidgetItemIterator it(treeOf(page));
    while (*it && *it != row)
        ++it;
    return lastTick && !*it;
}

// Two processes, the first with two threads, and the same with one change.
QVector<ProcessInfo> changed(int change)
{
    QVector<ProcessInfo> list{{"p", 10, {{"a", 11, 100, 1, 10, 0}, {"b", 12, 100, 2, 10, 0}}}, {"q", 20, {}}};
    switch (change) {
    case 1: list[0].threads[0].state = 3; list[0].threads[1].name = "c"; list[1].name = "r"; break;
    case 2: list[0].threads[1].id = 13; break;
    case 3: list[1].id = 21; break;
    case 4: list[1].threads.append({"d", 21, 100, 1, 20, 0}); break;
    case 5: list.removeLast(); break;
    }
    return list;
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
        QVERIFY(writeImage(m_stillImage.path(), Still) && writeImage(m_evolvingImage.path(), Evolving)
                && writeImage(m_emptyImage.path(), "<processes evolve='no'/>"));
        m_device = m_still.connectDevice(m_stillImage.path(), "still", {"--run-lifetime", "2500"});
        QVERIFY(m_device);
        QVERIFY(m_evolving.connectDevice(m_evolvingImage.path(), "evolving"));
        QVERIFY(m_empty.connectDevice(m_emptyImage.path(), "empty"));
        QVERIFY(m_failing.connectDevice(m_stillImage.path(), "failing", {"--fail", "GetProcesses=5"}));
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
        QTest::addColumn<int>("change");
        QTest::addColumn<bool>("same");
        QTest::newRow("none") << 0 << true;
        QTest::newRow("states and names") << 1 << true;
        QTest::newRow("thread id") << 2 << false;
        QTest::newRow("process id") << 3 << false;
        QTest::newRow("thread added") << 4 << false;
        QTest::newRow("process gone") << 5 << false;
    }

    void listsCompareByIds()
    {
        QFETCH(int, change);
        QFETCH(bool, same);
        LiveSnapshot<ProcessInfo> snapshot;
        const auto byIds = [](const QVector<ProcessInfo>& a, const QVector<ProcessInfo>& b) {
            return sameIds(a, b, &ProcessInfo::threads);
        };
        QVector<ProcessInfo> taken;
        QVERIFY(snapshot.offer(changed(0), byIds) && snapshot.take(taken) && !snapshot.take(taken));
        QCOMPARE(snapshot.offer(changed(change), byIds), !same);
        QCOMPARE(snapshot.take(taken), !same);
        QCOMPARE(taken, changed(same ? 0 : change));
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
        QTRY_COMPARE(appRows(page._processTree).size(), 1);
        QTreeWidgetItem* first = appRows(page._processTree).first();
        QCOMPARE(first->childCount(), 3);
        QCOMPARE(QStringList({first->child(0)->text(1), first->child(2)->text(1), life(first).left(3), life(first->child(1)).left(3)}),
                 QStringList({"app::Main", "app::Timer", "new", "new"}));
        QTRY_VERIFY_WITH_TIMEOUT(life(first).startsWith("gone"), 10000);
        QCOMPARE(m_device->RunApplication("/usermod/app/app.mod"), 0);
        QTRY_COMPARE(appRows(page._processTree).size(), 2);
        QTreeWidgetItem* second = appRows(page._processTree).at(appRows(page._processTree).first() == first ? 1 : 0);
        QVERIFY(second->text(ProcessView::IdColumn).toUInt() > first->text(ProcessView::IdColumn).toUInt());
        QVERIFY(life(second).startsWith("new") && life(first).startsWith("gone"));
        QVERIFY(ticksToRemoval(page, first));
        QCOMPARE(appRows(page._processTree), QList<QTreeWidgetItem*>({second}));
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
        const quint32 highest = shell->child(shell->childCount() - 1)->data(0, Page::IdRole).toUInt();
        const auto find = [shell](auto match) {
            QTreeWidgetItem* found = nullptr;
            for (int i = shell->childCount() - 1; i >= 0; --i)
                found = match(shell->child(i)) ? shell->child(i) : found;
            return found;
        };
        const auto isNew = [highest](QTreeWidgetItem* row) { return row->data(0, Page::IdRole).toUInt() > highest; };
        const auto isGone = [](QTreeWidgetItem* row) { return life(row).startsWith("gone"); };
        QTRY_VERIFY_WITH_TIMEOUT(find(isNew), 15000);
        const QTreeWidgetItem* added = find(isNew);
        QVERIFY2(life(added).startsWith("new") && life(added).endsWith("green"), qPrintable(life(added)));
        QCOMPARE(QStringList({added->text(1), added->text(2), added->text(3)}),
                 threads ? QStringList({"ui worker", added->text(2), "Default"}) : QStringList({"viewer.mod", "8192", "/sys/viewer.mod"}));
        QTRY_VERIFY_WITH_TIMEOUT(find(isGone), 15000);
        QVERIFY2(life(find(isGone)).endsWith("red"), qPrintable(life(find(isGone))));
        QVERIFY(ticksToRemoval(*page, find(isGone)));
    }

    // The statuses a page ends at: an empty device is ready without ever updating and goes on
    // polling; a failed poll ends the worker and its error stays; an unknown device starts nothing.
    void statusesAndFailures_data()
    {
        QTest::addColumn<bool>("threads");
        QTest::addColumn<QString>("device");
        QTest::addColumn<QString>("status");
        QTest::addColumn<GatewayComponentWidget::ComponentState>("state");
        QTest::newRow("empty device") << false << "empty" << "Ready" << GatewayComponentWidget::Complete;
        QTest::newRow("failing threads") << true << "failing" << "Error: 5" << GatewayComponentWidget::Failed;
        QTest::newRow("unknown device") << true << "nowhere" << "Device not found" << GatewayComponentWidget::Starting;
    }

    void statusesAndFailures()
    {
        QFETCH(bool, threads);
        QFETCH(QString, device);
        QFETCH(QString, status);
        QFETCH(GatewayComponentWidget::ComponentState, state);
        const bool polling = state == GatewayComponentWidget::Complete;
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
