#include "CITableWidgetItem.h"
#include "CITreeWidgetItem.h"
#include "FetchThread.h"
#include "PageFixtures.h"
#include "PageFeed.h"
#include "PageWorker.h"
#include "RecordTableModel.h"
#include "StubPage.h"
#include "TickPacer.h"

#include <QPointer>
#include <QRegularExpression>
#include <QHeaderView>
#include <QSemaphore>
#include <QSignalSpy>

#include <atomic>
#include <functional>
#include <memory>

namespace {

// What the fake device answers; its query waits at the gate until the test opens it.
struct FakeDevice
{
    QSemaphore gate;
    int result = 0;
    QVector<QString> records;

    void answer(int code, const QVector<QString>& answerRecords)
    {
        result = code;
        records = answerRecords;
        gate.release();
    }
};

class FakeFetchThread : public FetchThread<QString>
{
public:
    FakeFetchThread(GatewayComponentWidget* page, QSharedPointer<FakeDevice> device, Feed feed)
        : FetchThread<QString>(page, std::move(feed)), m_device(std::move(device)) {}

protected:
    int fetch(QVector<QString>& records) override
    {
        m_device->gate.acquire();
        records = m_device->records;
        return m_device->result;
    }
    void reportResult(int result) override
    {
        reportStatus(result ? GatewayComponentWidget::errorStatus(result) : QStringLiteral("Processing Records"),
                     result ? GatewayComponentWidget::Failed : GatewayComponentWidget::Processing);
    }

private:
    QSharedPointer<FakeDevice> m_device;
};

// A fetching page built like the module list: one row per tick while records wait. The
// tests tick it by hand.
struct FetchingPage : StubPage
{
    explicit FetchingPage(QSharedPointer<FakeDevice> device = QSharedPointer<FakeDevice>::create())
        : m_device(std::move(device))
    {
        setStatus(QStringLiteral("Starting"));
        pacer.armFirst(500);
    }
    void onTimeElapse()
    {
        if (!pacer.pace(feed->step([this](const QString& record) { rows.append(record); }), 0)) {
            setStatus(readyStatus());
            setState(Complete);
        }
    }
    void startComponent(const QString&) override
    {
        if (!worker.exists())
            worker.start(new FakeFetchThread(this, m_device, feed), QThread::LowPriority);
    }
    void raisePriority() override { worker.setPriority(QThread::HighestPriority); }
    void lowerPriority() override { worker.setPriority(QThread::LowestPriority); }

    QStringList rows;
    TickPacer pacer{1, 500};
    QSharedPointer<PageFeed<QString>> feed = QSharedPointer<PageFeed<QString>>::create();
    QSharedPointer<FakeDevice> m_device;
    PageWorker worker;
};

// A worker running the test's script, with the protected duties opened to it.
struct ScriptedThread : PageWorkerThread
{
    ScriptedThread(GatewayComponentWidget* page, std::function<void(ScriptedThread&)> script)
        : PageWorkerThread(page), m_script(std::move(script)) {}
    void work() override { m_script(*this); }
    using PageWorkerThread::pause;
    using PageWorkerThread::reportStatus;

    std::function<void(ScriptedThread&)> m_script;
};

const QList<QStringList> Modules = {
    {"AppletShell", "1.0", "/usermod/shell"},   {"Browser", "2.1", "/usermod/browser"},
    {"Calendar", "1.4", "/shared/diary"},       {"ShellBrowser", "3.0", "/usermod/shellbrowser"},
    {"UserShell", "shell 2", "/usermod/usershell"},
};

// The smallest searching page: a table view over Modules and a tree, searched through the base.
class SearchPage : public StubPage
{
public:
    SearchPage()
    {
        model.appendRows(QVector<QStringList>(Modules.cbegin(), Modules.cend()));
        table.setModel(&model);
    }
    bool search(const QString& text) override { return applyTableSearch(text, &table); }
    bool searchInTree(const QString& text) { return applyTreeSearch(text, &tree); }

    RecordTableModel model{{"Name", "Version", "Path"}};
    QTableView table;
    QTreeWidget tree;
};

// The visible rows, each as "row:" and its selected columns: "3:02" is row 3 shown with its
// first and last cells selected. A hidden row shows only with selected cells, as "-row:".
QString shown(const QTableView& table)
{
    QStringList rows;
    for (int row = 0; row < table.model()->rowCount(); ++row) {
        QString cells;
        for (int column = 0; column < table.model()->columnCount(); ++column)
            cells += table.selectionModel()->isSelected(table.model()->index(row, column)) ? QString::number(column) : QString();
        if (!table.isRowHidden(row) || !cells.isEmpty())
            rows.append(QString(table.isRowHidden(row) ? "-%1:" : "%1:").arg(row) + cells);
    }
    return rows.join(' ');
}

// Every selected (*) or expanded (+) item of the tree, in order.
QString marked(QTreeWidget& tree)
{
    QStringList items;
    for (QTreeWidgetItemIterator it(&tree); *it; ++it) {
        const QString marks = QString((*it)->isSelected() ? "*" : "") + ((*it)->isExpanded() ? "+" : "");
        if (!marks.isEmpty())
            items.append((*it)->text(0) + (*it)->text(1) + (*it)->text(2) + marks);
    }
    return items.join(' ');
}

} // namespace

// The page framework: the tick's pacing, the feed between worker and tick, the fetching
// worker and the teardown of workers; and what every page shares: the search duty, and the
// order of the table and tree items (item type first, for a tree only in its first column,
// then the text without regard to letter case, ids and numbers as text).
class TestPageFramework : public QObject
{
    Q_OBJECT

private slots:
    // The only place that states the back-off arithmetic. Script: armFirst (firstN), armIdle
    // (idle), armBusy (busyN), stop, a 3 ms sleep (late: sleeps never undershoot, so a 1 ms
    // tick is then overdue) and pace after a feed step (wait, shown with 1 ms, drained).
    // armed lists each delay, -1 for a pace that armed nothing.
    void tickPacer_data()
    {
        QTest::addColumn<int>("initial");
        QTest::addColumn<int>("cap");
        QTest::addColumn<QString>("script");
        QTest::addColumn<QList<int>>("armed");
        QTest::newRow("waiting from 1") << 1 << 500 << "first500 idle idle idle idle idle idle"
                                        << QList<int>{500, 101, 201, 301, 401, 500, 500};
        QTest::newRow("waiting from 0") << 0 << 500 << "idle idle idle idle idle" << QList<int>{100, 200, 300, 400, 500};
        QTest::newRow("draining resets the back-off") << 1 << 500 << "idle idle busy0 idle busy1 idle"
                                                      << QList<int>{101, 201, 0, 100, 1, 101};
        QTest::newRow("live page") << 0 << 2000 << "first1000 busy500 idle idle" << QList<int>{1000, 500, 600, 700};
        QTest::newRow("feed steps") << 1 << 500 << "wait shown wait drained" << QList<int>{101, 1, 101, -1};
        // A busy tick is due one interval after the previous one was due: a late one makes
        // the next come sooner. Whatever ends a busy run, the next counts from now.
        QTest::newRow("late busy tick made up") << 0 << 500 << "busy1 late busy1" << QList<int>{1, 0};
        QTest::newRow("busy at 0 stays at 0") << 0 << 500 << "busy0 late busy0 busy0" << QList<int>{0, 0, 0};
        QTest::newRow("run ended by idle") << 0 << 500 << "busy1 late idle busy1" << QList<int>{1, 101, 1};
        QTest::newRow("run ended by first") << 0 << 500 << "busy1 late first500 busy1" << QList<int>{1, 500, 1};
        QTest::newRow("run ended by stop") << 0 << 500 << "busy1 late stop busy1" << QList<int>{1, 1};
        QTest::newRow("run ended by another interval") << 0 << 500 << "busy1 late busy0 busy1" << QList<int>{1, 0, 1};
    }

    void tickPacer()
    {
        QFETCH(int, initial);
        QFETCH(int, cap);
        QFETCH(QString, script);
        QFETCH(QList<int>, armed);
        TickPacer pacer(initial, cap);
        QList<int> returned, emitted;
        connect(&pacer, &TickPacer::armed, this, [&emitted](int ms) { emitted.append(ms); });
        for (const QString& call : script.split(' ')) {
            const QString name = call.section(QRegularExpression("[0-9]"), 0, 0);
            const int ms = call.mid(name.size()).toInt();
            if (name == "idle")
                returned.append(pacer.armIdle());
            else if (name == "busy")
                returned.append(pacer.armBusy(ms));
            else if (name == "first")
                returned.append(pacer.armFirst(ms));
            else if (name == "stop")
                pacer.stop();
            else if (name == "late")
                QThread::msleep(3);
            else
                returned.append(pacer.pace(name == "wait" ? FeedStep::Waiting : name == "shown" ? FeedStep::Shown : FeedStep::Drained, 1)
                                    ? pacer.lastArmed() : -1);
        }
        QCOMPARE(returned, armed);
        QCOMPARE(pacer.isArmed(), armed.last() != -1);
        armed.removeAll(-1);
        QCOMPARE(emitted, armed);
    }

    // One timer: a re-arm replaces the pending tick, and the tick comes once.
    void feedStepsAndDrains()
    {
        PageFeed<int> feed;
        QList<int> shown;
        const auto show = [&shown](int value) { shown.append(value); };
        QCOMPARE(feed.step(show), FeedStep::Waiting);
        QCOMPARE(feed.drain(show), FeedStep::Waiting);
        feed.append(QVector<int>{1, 2, 3});
        QCOMPARE(feed.step(show), FeedStep::Shown);
        // The queue ran dry while the feed is open: the tick has shown rows and comes back.
        QCOMPARE(feed.drain(show), FeedStep::Shown);
        QCOMPARE(feed.drain(show), FeedStep::Waiting);
        feed.append(QVector<int>{4, 5});
        feed.close();
        QCOMPARE(feed.step(show), FeedStep::Shown);
        // The slice that shows the last record still says Shown: the closing work of the page
        // comes in a tick of its own.
        QCOMPARE(feed.drain(show), FeedStep::Shown);
        QCOMPARE(feed.drain(show), FeedStep::Drained);
        QCOMPARE(feed.step(show), FeedStep::Drained);
        QCOMPARE(shown, (QList<int>{1, 2, 3, 4, 5}));
        // A closed feed that never got a record is drained at once.
        feed.clear();
        feed.close();
        QCOMPARE(feed.drain(show), FeedStep::Drained);
    }

    // Until the device answers, ticks keep coming and show nothing; then one row per tick,
    // and "Ready" on the tick that shows the last record. A failure keeps the page polling.
    void fetch_data()
    {
        QTest::addColumn<int>("result");
        QTest::addColumn<QStringList>("records");
        QTest::addColumn<QString>("status");
        QTest::newRow("three records") << 0 << QStringList{"alpha", "beta", "gamma"} << "Ready";
        QTest::newRow("no records still completes") << 0 << QStringList() << "Ready";
        QTest::newRow("failure keeps polling") << 7 << QStringList{"ignored"} << "Error: 7";
    }

    void fetch()
    {
        QFETCH(int, result);
        QFETCH(QStringList, records);
        QFETCH(QString, status);
        auto device = QSharedPointer<FakeDevice>::create();
        FetchingPage page(device);
        QSignalSpy states(&page, &GatewayComponentWidget::stateChanged);
        page.startComponent("device");
        // One worker per page, at the priority the page asks for.
        PageWorkerThread* worker = page.worker.thread();
        page.startComponent("device");
        QCOMPARE(page.worker.thread(), worker);
        QCOMPARE(worker->priority(), QThread::LowPriority);
        page.raisePriority();
        QCOMPARE(worker->priority(), QThread::HighestPriority);
        page.lowerPriority();
        QCOMPARE(worker->priority(), QThread::LowestPriority);
        for (int i = 0; i < 3; ++i)
            page.onTimeElapse();
        QVERIFY(page.pacer.isArmed());
        QCOMPARE(page.status(), QString("Starting"));
        device->answer(result, records);
        QTRY_VERIFY(!page.worker.isRunning());
        for (int tick = 1; tick <= 3; ++tick) {
            page.onTimeElapse();
            QCOMPARE(page.rows, result ? QStringList() : records.mid(0, tick));
            QCOMPARE(page.isComplete(), result == 0 && tick >= records.size());
            QCOMPARE(page.pacer.isArmed(), !page.isComplete());
        }
        QCOMPARE(page.status(), status);
        QCOMPARE(PageFixtures::signalTexts(states), (result ? QStringList{"Failed"} : QStringList{"Processing", "Complete"}));
        // A worker that has ended keeps its last priority, without a warning.
        QTest::failOnWarning(QRegularExpression(".*"));
        page.raisePriority();
    }

    // A worker stuck in a device call when its page goes: teardown waits a bounded time; the
    // worker then reports nothing and deletes itself once it returns.
    void stuckWorkerOutlivesItsPage()
    {
        QSemaphore gate;
        std::atomic<int> reported{-1};
        auto page = std::make_unique<FetchingPage>();
        QPointer<PageWorkerThread> watch = new ScriptedThread(page.get(), [&](ScriptedThread& self) {
            gate.acquire();
            reported = self.reportStatus("late") ? 1 : 0;
        });
        page->worker.start(watch, QThread::NormalPriority);
        page.reset();
        QVERIFY(watch && watch->isRunning() && watch->isStopRequested());
        gate.release();
        QTRY_COMPARE(reported.load(), 0);
        QTRY_VERIFY(watch.isNull());
    }

    void teardownWakesPausedWorker()
    {
        auto* page = new FetchingPage;
        QPointer<PageWorkerThread> watch = new ScriptedThread(page, [](ScriptedThread& self) { while (self.pause(60000)) {} });
        page->worker.start(watch, QThread::NormalPriority);
        QTRY_VERIFY(watch->isRunning());
        delete page;
        QVERIFY(watch && watch->isFinished());
        QTRY_VERIFY(watch.isNull());
    }

    // Hits forming blocks, runs and single cells select exactly the hit cells.
    void tableSearch_data()
    {
        QTest::addColumn<QString>("text");
        QTest::addColumn<QString>("result");
        QTest::newRow("two characters clear") << "sh" << "0: 1: 2: 3: 4:";
        QTest::newRow("case-insensitive in any column") << "SHARED" << "2:2";
        QTest::newRow("two hits in a row") << "browser" << "1:02 3:02";
        QTest::newRow("runs and a block") << "shell" << "0:02 3:02 4:012";
        QTest::newRow("not across columns") << "Browser2.1" << "";
    }

    void tableSearch()
    {
        QFETCH(QString, text);
        QFETCH(QString, result);
        SearchPage page;
        QSignalSpy timed(&page, &GatewayComponentWidget::timedStatusChanged);
        QVERIFY(page.search(text));
        QCOMPARE(shown(page.table), result);
        QCOMPARE(PageFixtures::signalTexts(timed), result.isEmpty() ? QStringList{'"' + text + "\" not found."} : QStringList());
        QCOMPARE(page.searchText(), text.size() >= 3 ? text : QString());
    }

    void tableSearchReplacesPreviousAndClears()
    {
        SearchPage page;
        page.search("browser");
        // A cell the user selected besides the hits stays selected.
        page.table.selectionModel()->select(page.model.index(1, 1), QItemSelectionModel::Select);
        page.search("calendar");
        QCOMPARE(shown(page.table), QString("-1:1 2:0"));
        // A search without result hides every row until the search is cleared.
        page.search("nothing");
        QCOMPARE(shown(page.table), QString("-1:1"));
        page.search("ca");
        QCOMPARE(shown(page.table), QString("0: 1:1 2: 3: 4:"));
        // Hits follow their rows through a sort; clearing then shows every row again.
        page.search("shell");
        page.table.sortByColumn(2, Qt::DescendingOrder);
        QCOMPARE(page.model.text(0, 2), QString("/usermod/usershell"));
        QCOMPARE(shown(page.table), QString("0:012 1:02 2:02 -3:1"));
        page.clearTableSearch();
        QCOMPARE(shown(page.table), QString("0: 1: 2: 3:1 4:"));
    }

    void treeSearch()
    {
        SearchPage page;
        auto* audio = new QTreeWidgetItem(new QTreeWidgetItem(&page.tree, {"Multimedia"}), {"", "Audio"});
        for (const char* name : {"MidiPlayer", "Mixer", "MidiSynth"})
            new QTreeWidgetItem(audio, {"", "", name});
        auto* network = new QTreeWidgetItem(&page.tree, {"Network"});
        new QTreeWidgetItem(network, {"", "Sockets", "0x000000ab"});
        new QTreeWidgetItem(&page.tree, {"MidiTools"});
        network->setExpanded(true);
        network->child(0)->setSelected(true);
        QSignalSpy timed(&page, &GatewayComponentWidget::timedStatusChanged);
        QVERIFY(page.searchInTree("midi"));
        QCOMPARE(marked(page.tree), QString("Multimedia+ Audio+ MidiPlayer* MidiSynth* MidiTools*"));
        QVERIFY(page.searchInTree("0X0000"));
        QCOMPARE(marked(page.tree), QString("Network+ Sockets0x000000ab*"));
        QVERIFY(timed.isEmpty());
        QVERIFY(page.searchInTree("Sockets0x"));
        QCOMPARE(marked(page.tree), QString());
        QCOMPARE(PageFixtures::signalTexts(timed), QStringList{"\"Sockets0x\" not found."});
        page.searchInTree("0x0000");
        QVERIFY(!page.searchInTree("So"));
        QCOMPARE(marked(page.tree), QString());
        QVERIFY(page.searchText().isEmpty());
    }

    // A hit far down a long tree is brought into view, the topmost hit first.
    void treeSearchScrollsToFirstHit()
    {
        SearchPage page;
        for (int i = 0; i < 300; ++i)
            new QTreeWidgetItem(&page.tree, {QString("Node %1").arg(i)});
        new QTreeWidgetItem(page.tree.topLevelItem(250), {"", "Found here"});
        new QTreeWidgetItem(page.tree.topLevelItem(280), {"", "Found later"});
        page.tree.resize(300, 200);
        page.tree.show();
        QVERIFY(QTest::qWaitForWindowExposed(&page.tree));
        const auto inView = [&page](const QTreeWidgetItem* item) {
            return page.tree.viewport()->rect().contains(page.tree.visualItemRect(item));
        };
        const QTreeWidgetItem* first = page.tree.topLevelItem(250)->child(0);
        QVERIFY(!inView(first));
        QVERIFY(page.searchInTree("found"));
        QVERIFY(inView(first));
        QVERIFY(!inView(page.tree.topLevelItem(280)->child(0)));
    }

    // order: -1 the left item sorts first, 1 the right one, 0 neither.
    void order_data()
    {
        QTest::addColumn<int>("column");
        QTest::addColumn<int>("leftType");
        QTest::addColumn<QString>("left");
        QTest::addColumn<int>("rightType");
        QTest::addColumn<QString>("right");
        QTest::addColumn<int>("order");
        QTest::newRow("case ignored") << 0 << 0 << "apple" << 0 << "Banana" << -1;
        QTest::newRow("same text in other case") << 0 << 0 << "Media" << 0 << "media" << 0;
        QTest::newRow("ids as text") << 0 << 0 << "0x10" << 0 << "0x9" << -1;
        QTest::newRow("empty first") << 0 << 0 << "" << 0 << "a" << -1;
        QTest::newRow("non-ASCII without case") << 0 << 0 << "Ärger" << 0 << "ärmel" << -1;
        QTest::newRow("type before text") << 0 << 2 << "a" << 1 << "z" << 1;
        QTest::newRow("tree: type ignored in another column") << 1 << 2 << "a" << 1 << "z" << -1;
    }

    void order()
    {
        QFETCH(int, column);
        QFETCH(int, leftType);
        QFETCH(QString, left);
        QFETCH(int, rightType);
        QFETCH(QString, right);
        QFETCH(int, order);
        if (column == 0) {
            const CITableWidgetItem a(left, leftType), b(right, rightType);
            const QTableWidgetItem plain(right, rightType);
            QCOMPARE(a < b, order < 0);
            QCOMPARE(b < a, order > 0);
            QCOMPARE(a < plain, order < 0);
            // An item outside a tree sorts by its first column.
            CITreeWidgetItem l(leftType), r(rightType);
            l.setText(0, left);
            r.setText(0, right);
            QCOMPARE(l < r, order < 0);
        }
        QTreeWidget tree;
        tree.setColumnCount(2);
        tree.sortItems(column, Qt::AscendingOrder);
        auto* l = new CITreeWidgetItem(&tree, leftType);
        auto* r = new CITreeWidgetItem(&tree, rightType);
        // The other column holds the opposite order, so a wrong column shows.
        l->setText(column, left);
        l->setText(1 - column, "b");
        r->setText(column, right);
        r->setText(1 - column, "a");
        QCOMPARE(*l < *r, order < 0);
        QCOMPARE(*r < *l, order > 0);
        // The list pages' model: equal keys keep their order both ways.
        if (leftType == rightType) {
            RecordTableModel model({"only"});
            model.appendRows({{left}, {right}});
            model.sort(0, Qt::AscendingOrder);
            QCOMPARE(model.text(0, 0), order > 0 ? right : left);
            model.sort(0, Qt::DescendingOrder);
            QCOMPARE(model.text(0, 0), order < 0 ? right : left);
        }
    }

    // A header click sorts the view by that column without regard to case, rows whole;
    // equal cells keep the order the previous sort gave them, as a table of items does.
    void headerClickSortsRows()
    {
        RecordTableModel model({"Name", "Family"});
        model.appendRows({{"beta", "Media"}, {"Alpha", "kernel"}, {"gamma", "media"}, {"ALPHA", "audio"}, {"delta", "MEDIA"}});
        QTableView view;
        view.setModel(&model);
        view.horizontalHeader()->setSortIndicator(0, Qt::AscendingOrder);
        view.setSortingEnabled(true);
        view.resize(400, 300);
        view.show();
        QVERIFY(QTest::qWaitForWindowExposed(&view));
        const auto rows = [&model] {
            QStringList texts;
            for (const QStringList& row : model.rows())
                texts.append(row.join('/'));
            return texts.join(' ');
        };
        QCOMPARE(rows(), QString("Alpha/kernel ALPHA/audio beta/Media delta/MEDIA gamma/media"));
        QHeaderView* header = view.horizontalHeader();
        const auto click = [header](int section) {
            QTest::mouseClick(header->viewport(), Qt::LeftButton, {},
                              QPoint(header->sectionViewportPosition(section) + header->sectionSize(section) / 2, header->height() / 2));
        };
        click(1);
        QCOMPARE(rows(), QString("ALPHA/audio Alpha/kernel beta/Media delta/MEDIA gamma/media"));
        // The two alphas stay in the order the family sort gave them, not the order they came in.
        click(0);
        QCOMPARE(rows(), QString("ALPHA/audio Alpha/kernel beta/Media delta/MEDIA gamma/media"));
        QCOMPARE(model.arrivalIndex(0), 3);
        click(0);
        QCOMPARE(rows(), QString("gamma/media delta/MEDIA beta/Media ALPHA/audio Alpha/kernel"));
        QCOMPARE(model.headerData(0, Qt::Vertical), QVariant(1));
        QVERIFY(!(model.flags(model.index(0, 0)) & Qt::ItemIsEditable));
    }

    // The table item keeps its sort key beside its text; a new text must renew it.
    void tableItemSortsByItsNewText()
    {
        CITableWidgetItem item("aaa");
        const CITableWidgetItem middle("mmm");
        item.setText("ZZZ");
        QVERIFY(middle < item);
        item.setData(Qt::EditRole, "Aab");
        QVERIFY(item < middle);
    }
};

QTEST_MAIN(TestPageFramework)
#include "tst_pageframework.moc"
