#include "CITreeWidgetItem.h"
#include "ISettingsTreeView.h"
#include "ISettingsTreeViewThread.h"
#include "LivePollThread.h"
#include "LoadedModuleView.h"
#include "ModuleListView.h"
#include "PageFixtures.h"
#include "Portlex.h"
#include "ProcessView.h"
#include "RecordTableModel.h"
#include "RegistryListView.h"
#include "SimulatorProcess.h"
#include "TestSupport.h"
#include "_ZantDevice.h"

#include <QLineEdit>
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

bool liveImage(const QString& folder, const QByteArray& processes)
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


// A live page fed by hand, so that a test can list an id again.
class ListedPage : public LiveTreePage
{
public:
    QTreeWidget tree;
    LiveSnapshot<ProcessInfo> snapshot;

    ListedPage() { setTree(&tree, 1); }
    // Every list offered counts as a change; the next tick merges it.
    void offer(const QVector<ProcessInfo>& list)
    {
        snapshot.offer(list, [](const auto&, const auto&) { return false; });
    }
    QString componentName() override { return "Listed"; }

protected:
    PageWorkerThread* createWorker(const QSharedPointer<_ZantDevice>&) override { return nullptr; }
    Poll mergeSnapshot() override
    {
        return mergeFrom(snapshot, &ProcessInfo::threads, [](QTreeWidgetItem*, const ThreadEntry&) {});
    }
};

enum RegistryColumn { ClassTypeColumn, ClassHandlerColumn, FlagsColumn, MimeTypeColumn };
enum ModuleColumn { NameColumn, VersionColumn, TypeColumn, SignatureColumn, PathColumn, CopyrightColumn };

QByteArray module(const QByteArray& name, const QByteArray& version, const QByteArray& type, const QByteArray& signature,
                  const QByteArray& copyright)
{
    return "<module volume=\"flash\" folder=\"usermod/" + name + "\" name=\"" + name + "\" version=\"" + version
        + "\" type=\"" + type + "\" signature=\"" + signature + "\" copyright=\"" + copyright + "\" size=\"16\"/>\n";
}

// A module of the image description that registers one MIME type.
QByteArray mimeModule(const QByteArray& folder, const QByteArray& type, const QByteArray& handler, const QByteArray& base)
{
    return "<module volume=\"flash\" folder=\"" + folder + "\" name=\"" + folder.mid(folder.lastIndexOf('/') + 1)
        + "\" size=\"16\"><mime type=\"" + type + "\" handler=\"" + handler + "\" base=\"" + base + "\"/></module>\n";
}

// A system and a user module folder.
const QByteArray RegistryVolume = " modules=\"sys/mod usermod\" install=\"usermod\"";


// A node of the test store with one value, so that a node that was read shows it.
QByteArray node(const QByteArray& name, const QByteArray& children = QByteArray())
{
    return "<node name=\"" + name + "\"><value name=\"of\" text=\"" + name + "\"/>" + children + "</node>\n";
}

// prefix + first, ..., prefix + last, numbered in two digits.
QStringList numbered(const QString& prefix, int first, int last)
{
    QStringList names;
    for (int n = first; n <= last; ++n)
        names << prefix + QString::number(n).rightJustified(2, '0');
    return names;
}

QByteArray leaves(const QStringList& names)
{
    QByteArray nodes;
    for (const QString& name : names)
        nodes += node(name.toUtf8());
    return nodes;
}

const QByteArray Settings = "<settings><value name=\"root\" text=\"yes\"/>\n"
        + node("appinfo", "<value name=\"count\" text=\"34\"/><value name=\"Build\" text=\"b7\"/>" + node("a1") + node("a2") + node("a3"))
        + node("ztoversion", node("c")) + node("OATtest", node("t1") + node("t2"))
        + node("CSA_NORMAL", node("hidden1")) + node("csa_removal", node("hidden2"))
        + node("Zeta", leaves(numbered("z", 1, 11))) + node("alpha", node("a01", node("sub")) + leaves(numbered("a", 2, 10)))
        + "</settings>\n";

// The order the crawl reads the test store in: "appinfo" and "ztoversion" branches first,
// the other children of the root at 10 in plain string order, then the children of nodes
// with at most 10 children (11) before those of nodes with 11 (12), "oattest" last and
// the CSA branches never.
QStringList crawlOrder()
{
    return QStringList{"/", "/appinfo", "/appinfo/a1", "/appinfo/a2", "/appinfo/a3", "/ztoversion", "/ztoversion/c",
                       "/Zeta", "/alpha", "/alpha/a01", "/alpha/a01/sub"}
        + numbered("/alpha/a", 2, 10) + numbered("/Zeta/z", 1, 11)
        + QStringList{"/OATtest", "/OATtest/t1", "/OATtest/t2"};
}

int kindOf(const QTreeWidgetItem* item)
{
    return static_cast<const CITreeWidgetItem*>(item)->kind();
}

QString pathOf(const QTreeWidgetItem* item)
{
    QStringList names;
    for (; item; item = item->parent())
        names.prepend(item->text(0));
    return "/" + names.join('/');
}

QTreeWidgetItem* itemAt(const QTreeWidget* tree, const QString& path)
{
    for (QTreeWidgetItemIterator it(const_cast<QTreeWidget*>(tree)); *it; ++it) {
        if (kindOf(*it) != ISettingsTreeView::ValueKind && pathOf(*it) == path)
            return *it;
    }
    return nullptr;
}

// The nodes whose answer is in the tree (their values are hidden children), in order; a
// value that shows is listed as such.
QStringList readNodes(const QTreeWidget* tree)
{
    QStringList read;
    for (QTreeWidgetItemIterator it(const_cast<QTreeWidget*>(tree)); *it; ++it) {
        if (kindOf(*it) == ISettingsTreeView::ValueKind) {
            const QString parent = (*it)->parent() ? pathOf((*it)->parent()) : QString("/");
            if (!read.contains(parent))
                read << parent;
            if (!(*it)->isHidden())
                read << "shown value " + pathOf(*it);
        }
    }
    read.sort();
    return read;
}

} // namespace

// The pages that query a live device, on real simulators. Threads and loaded modules: a still
// device where the test starts applications, one whose threads and modules change by
// themselves, an empty one and a failing one. Module list, registry and settings tree: a small
// module image, images registering MIME types, a settings store, and devices failing their
// queries.
class TestQueryPages : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase()
    {
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        QVERIFY(Portlex::Initialize());
        QVERIFY(liveImage(m_stillImage.path(), Still) && liveImage(m_evolvingImage.path(), Evolving)
                && liveImage(m_emptyImage.path(), "<processes evolve='no'/>"));
        m_device = m_still.connectDevice(m_stillImage.path(), "still", {"--run-lifetime", "2500"});
        QVERIFY(m_device);
        QVERIFY(m_evolving.connectDevice(m_evolvingImage.path(), "evolving"));
        QVERIFY(m_empty.connectDevice(m_emptyImage.path(), "empty"));
        QVERIFY(m_failing.connectDevice(m_stillImage.path(), "failing", {"--fail", "GetProcesses=5"}));
        QVERIFY(writeImage(m_image.path(), "modules", " modules=\"usermod\"", {},
                           module("quote", "1.0", "Application", "test", "&quot;Q&quot; &amp; &lt;co&gt;")
                               + module("plain", "2.0", "Library", "maker", "P")));
        m_modules = m_simulator.connectDevice(m_image.path(), "modules");
        QVERIFY(m_modules);
        QVERIFY(writeImage(m_settingsImage.path(), "settings", {}, Settings));
        QVERIFY(m_settings.connectDevice(m_settingsImage.path(), "settings"));
    }

    void cleanupTestCase()
    {
        m_device.reset();
        m_modules.reset();
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

    // An id listed again while its row is marked gone gets its row back, shown, and the row
    // outlives the aging that would have removed it: a process and an entry.
    void goneRowsReturnWithTheirIds()
    {
        ListedPage page;
        const auto step = [&page](int change, int ticks) {
            page.offer(changed(change));
            tick(page, ticks);
            return lives(&page.tree);
        };
        QCOMPARE(step(0, Page::AgingTicks + 1), QStringList(4, "shown black"));
        QCOMPARE(step(5, 1), QStringList({"shown black", "shown black", "shown black", "gone 1 black"}));
        QCOMPARE(step(2, 1), QStringList({"shown black", "shown black", "gone 1 red", "new 1 green", "shown black"}));
        QCOMPARE(step(0, 1), QStringList({"shown black", "shown black", "shown black", "gone 1 red", "shown black"}));
        tick(page, Page::AgingTicks + 1);
        QCOMPARE(lives(&page.tree), QStringList(4, "shown black"));
        QCOMPARE(page.tree.topLevelItem(1)->data(0, Page::IdRole).toUInt(), 20u);
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

    // The export follows the table's order, escapes, and is frozen at its first call, even
    // when that came before the rows.
    void exportFollowsTheTableAndIsFrozen()
    {
        ModuleListView early;
        early.startComponent("modules");
        const QString empty = early.xmlReport();
        QCOMPARE(empty, QString("<!DOCTYPE zant-modules>\n<modules/>\n"));
        QVERIFY(fillByHand(early));
        QCOMPARE(early.model()->rowCount(), 2);
        QCOMPARE(early.xmlReport(), empty);

        ModuleListView page;
        QSignalSpy statuses(&page, &GatewayComponentWidget::statusChanged);
        page.startComponent("modules");
        QVERIFY(fillByHand(page));
        QCOMPARE(signalTexts(statuses), QStringList({"Processing Device Modules", "Ready"}));
        page._moduleTable->sortByColumn(PathColumn, Qt::DescendingOrder);
        const QString report = page.xmlReport();
        QCOMPARE(report, QString("<!DOCTYPE zant-modules>\n"
                                 "<modules>\n"
                                 " <module copyright=\"&quot;Q&quot; &amp; &lt;co&gt;\" path=\"/usermod/quote/quote.mif\" "
                                 "signature=\"Test Signed\" type=\"Application\" version=\"1.0\" name=\"quote\"/>\n"
                                 " <module copyright=\"P\" path=\"/usermod/plain/plain.mif\" signature=\"Maker Signed\" "
                                 "type=\"Library\" version=\"2.0\" name=\"plain\"/>\n"
                                 "</modules>\n"));
        page._moduleTable->sortByColumn(NameColumn, Qt::AscendingOrder);
        QCOMPARE(page.xmlReport(), report);
    }

    // A click brings the row's module; the row does not show its size and id, so the record
    // leaves them at 0.
    void clicksEmitTheRowsModule()
    {
        ModuleListView page;
        page.resize(900, 300);
        page.show();
        page.startComponent("modules");
        QVERIFY(fillByHand(page));
        QVERIFY(QTest::qWaitForWindowExposed(&page));
        QVector<ModuleInfo> modules;
        QCOMPARE(m_modules->GetModules(modules, nullptr, nullptr), 0);
        ModuleInfo expected;
        for (const ModuleInfo& module : std::as_const(modules))
            expected = module.name == "plain" ? module : expected;
        QVERIFY(expected.size != 0);
        expected.size = 0;
        expected.moduleId = 0;

        QTableView* table = page._moduleTable;
        const int row = int(columnTexts(page.model(), NameColumn).indexOf("plain"));
        const QPoint cell = table->visualRect(page.model()->index(row, PathColumn)).center();
        QSignalSpy singles(&page, &ModuleListView::singleClick);
        QSignalSpy doubles(&page, &ModuleListView::doubleClick);
        QTest::mouseClick(table->viewport(), Qt::LeftButton, {}, cell);
        QTest::mouseDClick(table->viewport(), Qt::LeftButton, {}, cell);
        QCOMPARE(singles.first().at(0).value<ModuleInfo>(), expected);
        QCOMPARE(doubles.count(), 1);
        QCOMPARE(doubles.at(0).at(0).value<ModuleInfo>(), expected);
        // An index of no row brings nothing.
        page.onTableDoubleClick(QModelIndex());
        QCOMPARE(doubles.count(), 1);
    }

    // The first claim of a MIME type is active, a later one not; a system module's claim is
    // restricted. Class type is the record's base class, class handler its handler class.
    void flagsAndClasses()
    {
        QTemporaryDir image;
        QVERIFY(writeImage(image.path(), "flags", RegistryVolume, {}, mimeModule("sys/mod/s1", "text/x-a", "0x00000011", "0x00000001")
                                             + mimeModule("sys/mod/s2", "text/x-a", "0x00000012", "0x00000002")
                                             + mimeModule("usermod/u1", "text/x-b", "0x00000013", "0x00000003")
                                             + mimeModule("usermod/u2", "TEXT/X-B", "0x00000014", "0x00000004")));
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY(simulator.connectDevice(image.path(), "flags"));
        RegistryListView page;
        QSignalSpy statuses(&page, &GatewayComponentWidget::statusChanged);
        page.startComponent("flags");
        QVERIFY(fillByHand(page));
        QCOMPARE(signalTexts(statuses), QStringList({"Querying Registry IDs", "Processing Registry Entries", "Ready"}));
        QCOMPARE(columnTexts(page.model(), ClassTypeColumn), QStringList({"1", "2", "3", "4"}));
        QCOMPARE(columnTexts(page.model(), ClassHandlerColumn), QStringList({"17", "18", "19", "20"}));
        QCOMPARE(columnTexts(page.model(), FlagsColumn), QStringList({"Active | Restricted", "Restricted", "Active", ""}));
        QCOMPARE(columnTexts(page.model(), MimeTypeColumn), QStringList({"text/x-a", "text/x-a", "text/x-b", "TEXT/X-B"}));
        QCOMPARE(page.xmlReport(), QString("<!DOCTYPE registrylist>\n<entries>\n"
                                           " <entry mime-type=\"text/x-a\" flags=\"Active | Restricted\" class-handler=\"17\" class-type=\"1\"/>\n"
                                           " <entry mime-type=\"text/x-a\" flags=\"Restricted\" class-handler=\"18\" class-type=\"2\"/>\n"
                                           " <entry mime-type=\"text/x-b\" flags=\"Active\" class-handler=\"19\" class-type=\"3\"/>\n"
                                           " <entry mime-type=\"TEXT/X-B\" flags=\"\" class-handler=\"20\" class-type=\"4\"/>\n"
                                           "</entries>\n"));
        // A cell refuses an edit by the keyboard, by a double-click and by the model alike.
        page.resize(600, 300);
        page.show();
        QVERIFY(QTest::qWaitForWindowExposed(&page));
        QTableView* table = page._registryTable;
        const QModelIndex cell = page.model()->index(0, MimeTypeColumn);
        table->setCurrentIndex(cell);
        QTest::keyClick(table, Qt::Key_F2);
        QTest::mouseDClick(table->viewport(), Qt::LeftButton, {}, table->visualRect(cell).center());
        QVERIFY(table->findChildren<QLineEdit*>().isEmpty());
        QVERIFY(!page.model()->setData(cell, "edited"));
        QCOMPARE(cell.data().toString(), QString("text/x-a"));
    }

    // A failed query leaves its text and an empty table; the tick goes on polling, and the
    // page never completes.
    void failedQueryKeepsPolling_data()
    {
        QTest::addColumn<bool>("registry");
        QTest::addColumn<QString>("rule");
        QTest::addColumn<QString>("status");
        QTest::addColumn<GatewayComponentWidget::ComponentState>("state");
        QTest::newRow("module list") << false << "GetModules=3" << "Error: 3" << GatewayComponentWidget::Failed;
        QTest::newRow("no registry object") << true << "GetRegistry=3" << "Registry Object is not available in DelvixStubs.dll1"
                                            << GatewayComponentWidget::Starting;
        QTest::newRow("negative registry code") << true << "GetRegistry=0xDEADBEEF" << "Error: -559038737"
                                                << GatewayComponentWidget::Starting;
    }

    void failedQueryKeepsPolling()
    {
        QFETCH(bool, registry);
        QFETCH(QString, rule);
        QFETCH(QString, status);
        QFETCH(GatewayComponentWidget::ComponentState, state);
        SimulatorProcess failing(m_sockets.path());
        QVERIFY(failing.connectDevice(SimulatorProcess::sampleImage("simulator"), "failing-query", {"--fail", rule}));
        const auto check = [&](auto& page) {
            QSignalSpy ticks(&page.pacer(), &TickPacer::timeout);
            page.startComponent("failing-query");
            QTRY_COMPARE(page.status(), status);
            const int ticksAtFailure = int(ticks.count());
            QTRY_VERIFY_WITH_TIMEOUT(ticks.count() >= ticksAtFailure + 2, 5000);
            QVERIFY(page.pacer().isArmed());
            QCOMPARE(page.model()->rowCount(), 0);
            QCOMPARE(page.status(), status);
            QCOMPARE(page.state(), state);
            QVERIFY(!page.isComplete() && !page.canSearch());
        };
        if (registry) {
            RegistryListView page;
            check(page);
        } else {
            ModuleListView page;
            check(page);
        }
    }

    // A device without entries still completes; with no row there is nothing to search.
    void emptyRegistryCompletes()
    {
        QTemporaryDir image;
        QVERIFY(writeImage(image.path(), "no-entries", RegistryVolume));
        SimulatorProcess empty(m_sockets.path());
        QVERIFY(empty.connectDevice(image.path(), "no-entries"));
        RegistryListView page;
        page.startComponent("no-entries");
        QVERIFY(fillByHand(page));
        QCOMPARE(page.state(), GatewayComponentWidget::Complete);
        QCOMPARE(page.model()->rowCount(), 0);
        QVERIFY(!page.canSearch());
        QCOMPARE(page.xmlReport(), QString("<!DOCTYPE registrylist>\n<entries/>\n"));
    }

    void childPriority_data()
    {
        QTest::addColumn<QString>("path");
        QTest::addColumn<bool>("childOfRoot");
        QTest::addColumn<int>("siblings");
        QTest::addColumn<int>("priority"); // -1: never read
        QTest::newRow("oattest in capitals") << "/x/OATTEST/y" << false << 3 << 20;
        QTest::newRow("oattest before appinfo") << "/appinfo/oatTest" << true << 3 << 20;
        QTest::newRow("appinfo") << "/AppInfo" << true << 3 << 1;
        QTest::newRow("below appinfo") << "/x/appinfo2/y" << false << 500 << 1;
        QTest::newRow("ztoversion") << "/ZTOversion/c" << false << 1 << 2;
        QTest::newRow("CSA_NORMAL") << "/CSA_NORMAL" << true << 3 << -1;
        QTest::newRow("csa_removal below") << "/x/csa_removal/y" << false << 3 << -1;
        QTest::newRow("child of the root") << "/x" << true << 500 << 10;
        QTest::newRow("zant marks nothing") << "/zant" << false << 3 << 11;
        QTest::newRow("10 siblings") << "/x/y" << false << 10 << 11;
        QTest::newRow("11 siblings") << "/x/y" << false << 11 << 12;
        QTest::newRow("50 siblings") << "/x/y" << false << 50 << 12;
        QTest::newRow("51 siblings") << "/x/y" << false << 51 << 13;
        QTest::newRow("100 siblings") << "/x/y" << false << 100 << 13;
        QTest::newRow("101 siblings") << "/x/y" << false << 101 << 14;
    }

    void childPriority()
    {
        QFETCH(QString, path);
        QFETCH(bool, childOfRoot);
        QFETCH(int, siblings);
        QFETCH(int, priority);
        const std::optional<quint16> found = ISettingsTreeViewThread::childPriority(path, childOfRoot, siblings);
        QCOMPARE(found ? int(*found) : -1, priority);
    }

    // The crawl reads the store in its order and ends at the first node the device refuses:
    // silently for 0xDEADBEEF (the page completes), with the code for any other (the page
    // fails). Either way the nodes read before stay in the tree.
    void crawlEndsAtAFailingNode_data()
    {
        QTest::addColumn<QString>("failing");
        QTest::addColumn<QString>("code");
        QTest::addColumn<QString>("status");
        QTest::newRow("none") << QString() << QString() << "Ready";
        QTest::newRow("0xDEADBEEF at the root") << "/" << "0xDEADBEEF" << "Ready";
        QTest::newRow("error among the 11s") << "/alpha/a02" << "5" << "Error: 5";
        QTest::newRow("error at oattest") << "/OATtest" << "0x10" << "Error: 16";
    }

    void crawlEndsAtAFailingNode()
    {
        QFETCH(QString, failing);
        QFETCH(QString, code);
        QFETCH(QString, status);
        SimulatorProcess simulator(m_sockets.path());
        const QStringList rule = failing.isEmpty() ? QStringList() : QStringList{"--fail", "GetChildSettings:" + failing + "=" + code};
        QVERIFY(simulator.connectDevice(m_settingsImage.path(), "crawl", rule));
        ISettingsTreeView page;
        page.startComponent("crawl");
        const bool fails = status != "Ready";
        QVERIFY(tickUntil(page, [&page] { return page.state() == GatewayComponentWidget::Complete || !page.pacer().isArmed(); }));
        QCOMPARE(page.status(), status);
        QCOMPARE(page.state(), fails ? GatewayComponentWidget::Failed : GatewayComponentWidget::Complete);
        QVERIFY(page._settingsTree->isSortingEnabled());

        QStringList expected = crawlOrder();
        if (!failing.isEmpty())
            expected = expected.mid(0, int(expected.indexOf(failing)));
        expected.sort();
        QCOMPARE(readNodes(page._settingsTree), expected);
        if (failing.isEmpty()) {
            // Shown as the children of a node that was read, never read themselves.
            QCOMPARE(itemAt(page._settingsTree, "/CSA_NORMAL")->childCount(), 0);
            QCOMPARE(itemAt(page._settingsTree, "/csa_removal")->childCount(), 0);
        }
    }

    // An id the gateway does not know starts nothing; showing the page again tries again.
    // Then choosing a node with values lists them by name, the names not selectable; a node
    // without values empties the table.
    void selectedNodeShowsItsValues()
    {
        ISettingsTreeView page;
        page.startComponent("missing");
        QCOMPARE(page.status(), QString("Device not found"));
        QCOMPARE(page.state(), GatewayComponentWidget::Starting);
        QVERIFY(!page.pacer().isArmed());
        page.startComponent("settings");
        QVERIFY(tickUntil(page, [&page] { return page.state() == GatewayComponentWidget::Complete; }));
        QTableWidget* table = page._nameValueTable;
        page._settingsTree->setCurrentItem(itemAt(page._settingsTree, "/appinfo"));
        QCOMPARE(columnTexts(table, 0), QStringList({"Build", "count", "of"}));
        QCOMPARE(columnTexts(table, 1), QStringList({"b7", "34", "appinfo"}));
        QCOMPARE(table->item(0, 0)->flags(), Qt::NoItemFlags);
        page._settingsTree->setCurrentItem(itemAt(page._settingsTree, "/CSA_NORMAL"));
        QCOMPARE(table->rowCount(), 0);
        page._settingsTree->setCurrentItem(itemAt(page._settingsTree, "/alpha/a01/sub"));
        QCOMPARE(columnTexts(table, 1), QStringList("sub"));
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
    QTemporaryDir m_image;
    QTemporaryDir m_settingsImage;
    SimulatorProcess m_simulator{m_sockets.path()};
    SimulatorProcess m_settings{m_sockets.path()};
    QSharedPointer<_ZantDevice> m_modules;
};

QTEST_MAIN(TestQueryPages)
#include "tst_querypages.moc"
