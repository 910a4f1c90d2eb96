#include "PageWorkerThread.h"
#include "TickPacer.h"

#include <QSemaphore>
#include <QSignalSpy>
#include <QTest>

namespace {

// Steps through deadlines one millisecond apart, starting from one already past, and
// reports each pause's outcome.
class SteppingThread : public PageWorkerThread
{
public:
    explicit SteppingThread(QDeadlineTimer first)
        : PageWorkerThread(nullptr)
        , m_next(first)
    {
    }

    QList<bool> outcomes;
    QSemaphore stepped;

protected:
    void work() override
    {
        for (int i = 0; i < 3; ++i) {
            outcomes.append(pauseUntil(m_next));
            m_next += 1;
            stepped.release();
        }
        // Far in the future: only a stop request ends this one.
        outcomes.append(pauseUntil(QDeadlineTimer(60000)));
    }

private:
    QDeadlineTimer m_next;
};

} // namespace

// Busy ticks and worker steps keep their rate: a late one makes the next come sooner.
class TestPacingRate : public QObject
{
    Q_OBJECT

private slots:
    void lateBusyTickIsMadeUp()
    {
        TickPacer pacer(0, 500);
        QCOMPARE(pacer.armBusy(1), 1);
        // Sleeps never undershoot: the second tick is now at least 1 ms overdue.
        QThread::msleep(3);
        QCOMPARE(pacer.armBusy(1), 0);
        QCOMPARE(pacer.lastArmed(), 0);
        QCOMPARE(pacer.interval(), 1);
        QVERIFY(pacer.isArmed());
    }

    void runsRestart_data()
    {
        QTest::addColumn<QString>("between");
        QTest::newRow("idle") << "idle";
        QTest::newRow("first") << "first";
        QTest::newRow("stop") << "stop";
        QTest::newRow("other interval") << "busy0";
    }

    // Whatever ends a busy run, the next one counts from now, not from an old due time.
    void runsRestart()
    {
        QFETCH(QString, between);
        TickPacer pacer(0, 500);
        pacer.armBusy(1);
        QThread::msleep(3);
        if (between == "idle")
            pacer.armIdle();
        else if (between == "first")
            pacer.armFirst(500);
        else if (between == "stop")
            pacer.stop();
        else
            QCOMPARE(pacer.armBusy(0), 0);
        QSignalSpy armed(&pacer, &TickPacer::armed);
        QCOMPARE(pacer.armBusy(1), 1);
        QCOMPARE(armed.count(), 1);
        QCOMPARE(armed.first().first().toInt(), 1);
    }

    void busyRunsAtZeroStayAtZero()
    {
        TickPacer pacer(0, 500);
        for (int i = 0; i < 3; ++i)
            QCOMPARE(pacer.armBusy(0), 0);
    }

    void workerStepsToPastDeadlinesAndStops()
    {
        SteppingThread thread(QDeadlineTimer::current(Qt::PreciseTimer));
        thread.start();
        // Deadlines already past (or 1 and 2 ms ahead) are all reached.
        QVERIFY(thread.stepped.tryAcquire(3, 10000));
        thread.requestStop();
        QVERIFY(thread.wait(10000));
        QCOMPARE(thread.outcomes, QList<bool>({true, true, true, false}));
    }
};

QTEST_MAIN(TestPacingRate)
#include "tst_pacingrate.moc"
