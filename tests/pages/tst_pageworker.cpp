#include "FetchThread.h"
#include "PageFixtures.h"
#include "PageFeed.h"
#include "PageWorker.h"
#include "StubPage.h"
#include "TickPacer.h"

#include <QPointer>
#include <QRegularExpression>
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
    bool isComplete() override { return statusIsReady(); }

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

} // namespace

// The page framework: the tick's pacing, the feed between worker and tick, the fetching
// worker and the teardown of workers.
class TestPageWorker : public QObject
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
};

QTEST_MAIN(TestPageWorker)
#include "tst_pageworker.moc"
