#include "FetchThread.h"
#include "GatewayComponentWidget.h"
#include "PageFeed.h"
#include "PageWorker.h"
#include "PageWorkerThread.h"
#include "TickPacer.h"

#include <QPointer>
#include <QRegularExpression>
#include <QSemaphore>
#include <QSignalSpy>
#include <QTest>

#include <atomic>

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
        : FetchThread<QString>(page, std::move(feed))
        , m_device(std::move(device))
    {
    }

protected:
    int fetch(QVector<QString>& records) override
    {
        m_device->gate.acquire();
        records = m_device->records;
        return m_device->result;
    }

    void reportResult(int result) override
    {
        if (result == 0)
            reportStatus(QStringLiteral("Processing Records"), GatewayComponentWidget::Processing);
        else
            reportStatus(GatewayComponentWidget::errorStatus(result), GatewayComponentWidget::Failed);
    }

private:
    QSharedPointer<FakeDevice> m_device;
};

// A fetching page built like the module list: first tick after 500 ms, idle back-off from
// 1 ms by 100 up to 500, one row per tick at 0 ms while records wait.
class FetchingPage : public GatewayComponentWidget
{
public:
    explicit FetchingPage(QSharedPointer<FakeDevice> device, bool timerDriven = false)
        : m_device(std::move(device))
    {
        setStatus(QStringLiteral("Starting"));
        if (timerDriven)
            connect(&pacer, &TickPacer::timeout, this, [this] { onTimeElapse(); });
        pacer.armFirst(500);
    }

    void onTimeElapse()
    {
        const FeedStep step = feed->step([this](const QString& record) { rows.append(record); });
        if (!pacer.pace(step, 0)) {
            setStatus(readyStatus());
            setState(Complete);
        }
    }

    QString componentName() override { return QStringLiteral("Fetching"); }
    void startComponent(const QString&) override
    {
        if (!worker.exists())
            worker.start(new FakeFetchThread(this, m_device, feed), QThread::LowPriority);
    }
    bool canSearch() override { return statusIsReady(); }
    bool search(const QString&) override { return false; }
    void raisePriority() override { worker.setPriority(QThread::HighestPriority); }
    void lowerPriority() override { worker.setPriority(QThread::LowestPriority); }
    bool isComplete() override { return statusIsReady(); }
    QString xmlReport() override { return QString(); }

    QStringList rows;
    TickPacer pacer{1, 500};
    QSharedPointer<PageFeed<QString>> feed = QSharedPointer<PageFeed<QString>>::create();
    PageWorker worker;

private:
    QSharedPointer<FakeDevice> m_device;
};

// A page that runs whatever worker the test gives it.
class WorkerPage : public GatewayComponentWidget
{
public:
    QString componentName() override { return QStringLiteral("Worker"); }
    void startComponent(const QString&) override {}
    bool canSearch() override { return false; }
    bool search(const QString&) override { return false; }
    void raisePriority() override {}
    void lowerPriority() override {}
    QString xmlReport() override { return QString(); }

    PageWorker worker;
};

// Stuck in a device call until the gate opens, then tries to report to its page.
class StuckThread : public PageWorkerThread
{
public:
    StuckThread(GatewayComponentWidget* page, QSemaphore* gate, std::atomic<int>* reported)
        : PageWorkerThread(page)
        , m_gate(gate)
        , m_reported(reported)
    {
    }

protected:
    void work() override
    {
        m_gate->acquire();
        *m_reported = reportStatus(QStringLiteral("late")) ? 1 : 0;
    }

private:
    QSemaphore* m_gate;
    std::atomic<int>* m_reported;
};

// Idles in long pauses until asked to stop.
class IdleThread : public PageWorkerThread
{
public:
    explicit IdleThread(GatewayComponentWidget* page)
        : PageWorkerThread(page)
    {
    }

protected:
    void work() override
    {
        while (pause(60000)) {
        }
    }
};

QList<int> armedIntervals(const QSignalSpy& spy)
{
    QList<int> intervals;
    for (const QList<QVariant>& arguments : spy)
        intervals.append(arguments.at(0).toInt());
    return intervals;
}

} // namespace

class TestPageWorker : public QObject
{
    Q_OBJECT

private slots:
    void tickPacer_data()
    {
        QTest::addColumn<int>("initial");
        QTest::addColumn<int>("cap");
        QTest::addColumn<QString>("script");
        QTest::addColumn<QList<int>>("armed");
        QTest::addColumn<int>("finalInterval");

        QTest::newRow("waiting from 1") << 1 << 500 << "first500 idle idle idle idle idle idle"
                                        << QList<int>{500, 101, 201, 301, 401, 500, 500} << 500;
        QTest::newRow("waiting from 0") << 0 << 500 << "idle idle idle idle idle idle"
                                        << QList<int>{100, 200, 300, 400, 500, 500} << 500;
        QTest::newRow("draining resets the back-off") << 1 << 500 << "idle idle busy0 idle busy1 idle"
                                                      << QList<int>{101, 201, 0, 100, 1, 101} << 101;
        QTest::newRow("live page") << 0 << 2000 << "first1000 busy500 idle idle idle idle idle idle idle idle idle idle idle idle idle idle idle idle idle"
                                   << QList<int>{1000, 500, 600, 700, 800, 900, 1000, 1100, 1200, 1300, 1400,
                                                 1500, 1600, 1700, 1800, 1900, 2000, 2000, 2000}
                                   << 2000;
    }

    void tickPacer()
    {
        QFETCH(int, initial);
        QFETCH(int, cap);
        QFETCH(QString, script);
        QFETCH(QList<int>, armed);
        QFETCH(int, finalInterval);

        TickPacer pacer(initial, cap);
        QSignalSpy spy(&pacer, &TickPacer::armed);
        QList<int> returned;
        for (const QString& call : script.split(' ')) {
            if (call == "idle")
                returned.append(pacer.armIdle());
            else if (call.startsWith("busy"))
                returned.append(pacer.armBusy(call.mid(4).toInt()));
            else
                returned.append(pacer.armFirst(call.mid(5).toInt()));
        }
        QCOMPARE(returned, armed);
        QCOMPARE(armedIntervals(spy), armed);
        QCOMPARE(pacer.interval(), finalInterval);
        QVERIFY(pacer.isArmed());
    }

    void tickPacerFollowsFeedSteps()
    {
        TickPacer pacer(1, 500);
        QSignalSpy spy(&pacer, &TickPacer::armed);
        QVERIFY(pacer.pace(FeedStep::Waiting, 0));
        QVERIFY(pacer.pace(FeedStep::Shown, 1));
        QVERIFY(pacer.pace(FeedStep::Waiting, 0));
        QVERIFY(pacer.isArmed());
        QVERIFY(!pacer.pace(FeedStep::Drained, 0));
        QVERIFY(!pacer.isArmed());
        QCOMPARE(armedIntervals(spy), (QList<int>{101, 1, 101}));
    }

    void feedSteps()
    {
        PageFeed<int> feed;
        QList<int> shown;
        const auto show = [&shown](int value) { shown.append(value); };

        QCOMPARE(feed.step(show), FeedStep::Waiting);
        feed.append(QVector<int>{1, 2});
        QCOMPARE(feed.count(), 2);
        QCOMPARE(feed.step(show), FeedStep::Shown);
        feed.close();
        QCOMPARE(feed.step(show), FeedStep::Drained);
        QCOMPARE(feed.step(show), FeedStep::Drained);
        QCOMPARE(shown, (QList<int>{1, 2}));

        // A closed feed that never got a record is drained at once.
        feed.clear();
        QVERIFY(!feed.isClosed());
        feed.close();
        QCOMPARE(feed.step(show), FeedStep::Drained);
        QCOMPARE(shown.size(), 2);
    }

    // Ticks come at 500 ms, then 101, 201, ... 500 while the device has not answered; then
    // one row per tick at 0 ms, and "Ready" on the tick that shows the last record.
    void fetchPacingAndFill()
    {
        auto device = QSharedPointer<FakeDevice>::create();
        FetchingPage page(device);
        QCOMPARE(page.pacer.lastArmed(), 500);
        QSignalSpy armed(&page.pacer, &TickPacer::armed);
        QSignalSpy states(&page, &GatewayComponentWidget::stateChanged);
        page.startComponent(QStringLiteral("device"));

        for (int i = 0; i < 6; ++i)
            page.onTimeElapse();
        QCOMPARE(armedIntervals(armed), (QList<int>{101, 201, 301, 401, 500, 500}));
        QCOMPARE(page.status(), QString("Starting"));
        QVERIFY(page.rows.isEmpty());

        device->answer(0, {"alpha", "beta", "gamma"});
        QTRY_VERIFY(page.feed->isClosed());
        QCOMPARE(page.status(), QString("Processing Records"));
        QCOMPARE(page.state(), GatewayComponentWidget::Processing);

        armed.clear();
        page.onTimeElapse();
        page.onTimeElapse();
        QCOMPARE(page.status(), QString("Processing Records"));
        page.onTimeElapse();
        QCOMPARE(armedIntervals(armed), (QList<int>{0, 0}));
        QVERIFY(!page.pacer.isArmed());
        QCOMPARE(page.rows, (QStringList{"alpha", "beta", "gamma"}));
        QCOMPARE(page.status(), QString("Ready"));
        QCOMPARE(page.state(), GatewayComponentWidget::Complete);
        QCOMPARE(states.count(), 2);
        QVERIFY(page.isComplete());
    }

    void fetchOutcomes_data()
    {
        QTest::addColumn<int>("result");
        QTest::addColumn<QVector<QString>>("records");
        QTest::addColumn<QString>("status");
        QTest::addColumn<int>("state");
        QTest::addColumn<QList<int>>("armed");

        QTest::newRow("one record") << 0 << QVector<QString>{"only"} << "Ready" << 2 << QList<int>();
        QTest::newRow("no records still completes") << 0 << QVector<QString>() << "Ready" << 2 << QList<int>();
        QTest::newRow("failure keeps polling") << 7 << QVector<QString>{"ignored"} << "Error: 7" << 3
                                               << QList<int>{101, 201, 301, 401, 500, 500};
    }

    void fetchOutcomes()
    {
        QFETCH(int, result);
        QFETCH(QVector<QString>, records);
        QFETCH(QString, status);
        QFETCH(int, state);
        QFETCH(QList<int>, armed);

        auto device = QSharedPointer<FakeDevice>::create();
        device->answer(result, records);
        FetchingPage page(device);
        page.startComponent(QStringLiteral("device"));
        QTRY_VERIFY(!page.worker.isRunning());
        QCOMPARE(page.feed->isClosed(), result == 0);

        QSignalSpy spy(&page.pacer, &TickPacer::armed);
        const int ticks = result == 0 ? 1 : 6;
        for (int i = 0; i < ticks; ++i)
            page.onTimeElapse();
        QCOMPARE(armedIntervals(spy), armed);
        QCOMPARE(page.status(), status);
        QCOMPARE(int(page.state()), state);
        QCOMPARE(page.rows.size(), result == 0 ? records.size() : 0);
    }

    void timerDrivesPageToReady()
    {
        auto device = QSharedPointer<FakeDevice>::create();
        device->answer(0, {"one", "two"});
        FetchingPage page(device, true);
        page.startComponent(QStringLiteral("device"));
        QTRY_COMPARE(page.status(), QString("Ready"));
        QCOMPARE(page.rows, (QStringList{"one", "two"}));
        QVERIFY(!page.pacer.isArmed());
    }

    void oneWorkerPerPageAndPriorities()
    {
        auto device = QSharedPointer<FakeDevice>::create();
        FetchingPage page(device);
        page.startComponent(QStringLiteral("device"));
        PageWorkerThread* first = page.worker.thread();
        page.startComponent(QStringLiteral("device"));
        QCOMPARE(page.worker.thread(), first);
        QCOMPARE(first->priority(), QThread::LowPriority);

        page.raisePriority();
        QCOMPARE(first->priority(), QThread::HighestPriority);
        page.lowerPriority();
        QCOMPARE(first->priority(), QThread::LowestPriority);

        // A worker that has ended keeps its last priority, without a warning.
        device->answer(0, {});
        QTRY_VERIFY(!page.worker.isRunning());
        QTest::failOnWarning(QRegularExpression(".*"));
        page.raisePriority();
    }

    // Teardown waits a bounded time for a worker stuck in a device call; the worker, once it
    // returns, finds its page gone, reports nothing and deletes itself.
    void teardownLeavesStuckWorkerBehind()
    {
        QSemaphore gate;
        std::atomic<int> reported{-1};
        auto* page = new WorkerPage;
        auto* thread = new StuckThread(page, &gate, &reported);
        QPointer<PageWorkerThread> watch(thread);
        page->worker.start(thread, QThread::NormalPriority);

        delete page;
        QVERIFY(watch);
        QVERIFY(watch->isRunning());
        QVERIFY(watch->isStopRequested());

        gate.release();
        QTRY_VERIFY(watch.isNull());
        QCOMPARE(reported.load(), 0);
    }

    void teardownWakesPausedWorker()
    {
        auto* page = new WorkerPage;
        auto* thread = new IdleThread(page);
        QPointer<PageWorkerThread> watch(thread);
        page->worker.start(thread, QThread::NormalPriority);
        QTRY_VERIFY(thread->isRunning());

        delete page;
        QVERIFY(watch);
        QVERIFY(watch->isFinished());
        QTRY_VERIFY(watch.isNull());
    }

    void reportsReachThePageWhileHeld()
    {
        QSemaphore gate;
        std::atomic<int> reported{-1};
        WorkerPage page;
        QSignalSpy status(&page, &GatewayComponentWidget::statusChanged);
        page.worker.start(new StuckThread(&page, &gate, &reported), QThread::NormalPriority);
        gate.release();
        QTRY_COMPARE(reported.load(), 1);
        QTRY_COMPARE(status.count(), 1);
        QCOMPARE(page.status(), QString("late"));
    }
};

QTEST_MAIN(TestPageWorker)
#include "tst_pageworker.moc"
