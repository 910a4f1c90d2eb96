#include "PageFeed.h"

#include <QTest>
#include <QThread>

// A tick's batch: PageFeed::drain shows what is pending within its time budget.
class TestPageFeedDrain : public QObject
{
    Q_OBJECT

private slots:
    void drainShowsWhatIsPending()
    {
        PageFeed<int> feed;
        QList<int> shown;
        const auto show = [&shown](int value) { shown.append(value); };

        QCOMPARE(feed.drain(show), FeedStep::Waiting);
        feed.append(QVector<int>{1, 2, 3});
        // The queue ran dry while the feed is open: the tick has shown rows and comes back.
        QCOMPARE(feed.drain(show), FeedStep::Shown);
        QCOMPARE(shown, QList<int>({1, 2, 3}));
        QCOMPARE(feed.drain(show), FeedStep::Waiting);

        feed.append(QVector<int>{4, 5});
        feed.close();
        QCOMPARE(feed.drain(show), FeedStep::Drained);
        QCOMPARE(shown, QList<int>({1, 2, 3, 4, 5}));
        QCOMPARE(feed.drain(show), FeedStep::Drained);
        QCOMPARE(shown.size(), 5);
    }

    void drainStopsAtItsBudget()
    {
        PageFeed<int> feed;
        feed.append(QVector<int>(100, 7));
        int shown = 0;
        // Every record takes at least 2 ms.
        const auto slowShow = [&shown](int) {
            ++shown;
            QThread::msleep(2);
        };
        // A budget spent by the first record still shows that one, and no more.
        QCOMPARE(feed.drain(slowShow, 1), FeedStep::Shown);
        QCOMPARE(shown, 1);

        // A 5 ms budget is spent by the third record at the latest.
        shown = 0;
        QCOMPARE(feed.drain(slowShow, 5), FeedStep::Shown);
        QVERIFY(shown >= 1);
        QVERIFY(shown <= 3);
        QCOMPARE(feed.count(), 99 - shown);
    }
};

QTEST_APPLESS_MAIN(TestPageFeedDrain)
#include "tst_pagefeeddrain.moc"
