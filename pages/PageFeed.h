#pragma once

#include <QElapsedTimer>
#include <QMutex>
#include <QMutexLocker>
#include <QQueue>
#include <QVector>

#include <utility>

// What one tick of a page achieved with its feed.
enum class FeedStep
{
    Waiting, // nothing pending and more may come: back off
    Shown,   // records were shown: come back soon
    Drained  // everything delivered has been shown and nothing more will come
};

// How long one tick may go on showing records before it lets the event loop paint and
// handle input again: half a frame, leaving the other half to the view's layout and paint.
constexpr int TickBudgetMs = 8;

// Records passed from a page's worker thread to its GUI thread. The worker appends and
// finally closes the feed; the GUI thread takes one record (step) or a time slice (drain)
// per tick. Every access takes the feed's mutex, and only for the single operation, so
// neither side ever waits for the other's device call or row filling. Page and worker share it through a QSharedPointer,
// so a worker that outlives its page still writes into live memory.
template <typename Record>
class PageFeed
{
public:
    void append(const Record& record)
    {
        QMutexLocker lock(&m_mutex);
        m_items.enqueue(record);
    }

    void append(const QVector<Record>& records)
    {
        QMutexLocker lock(&m_mutex);
        for (const Record& record : records)
            m_items.enqueue(record);
    }

    // The worker has appended everything it will append.
    void close()
    {
        QMutexLocker lock(&m_mutex);
        m_closed = true;
    }

    bool isClosed() const
    {
        QMutexLocker lock(&m_mutex);
        return m_closed;
    }

    bool isEmpty() const
    {
        QMutexLocker lock(&m_mutex);
        return m_items.isEmpty();
    }

    int count() const
    {
        QMutexLocker lock(&m_mutex);
        return int(m_items.size());
    }

    // Forgets the pending records and reopens the feed (a reload).
    void clear()
    {
        QMutexLocker lock(&m_mutex);
        m_items.clear();
        m_closed = false;
    }

    bool takeFirst(Record& record)
    {
        QMutexLocker lock(&m_mutex);
        if (m_items.isEmpty())
            return false;
        record = m_items.dequeue();
        return true;
    }

    // One tick on the GUI thread: hands the first pending record to show (outside the lock)
    // and says what the tick should do next.
    template <typename Show>
    FeedStep step(Show&& show)
    {
        Record record;
        bool drained = false;
        {
            QMutexLocker lock(&m_mutex);
            if (m_items.isEmpty())
                return m_closed ? FeedStep::Drained : FeedStep::Waiting;
            record = m_items.dequeue();
            drained = m_closed && m_items.isEmpty();
        }
        std::forward<Show>(show)(record);
        return drained ? FeedStep::Drained : FeedStep::Shown;
    }

    // One time slice of a tick: shows pending records until budgetMs is spent, at least one
    // when there is one, so a long list costs one turn of the event loop, and one repaint,
    // per slice instead of per record. A slice that has shown something says Shown even
    // when the queue ran dry or the feed is drained: the tick comes back at once, and the
    // page's closing work (a sort, "Ready") gets a tick of its own. Use it with
    // TickPacer::pace(step, 0); a page that adds rows to a model collects them in show and
    // inserts them after the slice as one batch.
    template <typename Show>
    FeedStep drain(Show&& show, int budgetMs = TickBudgetMs)
    {
        QElapsedTimer spent;
        spent.start();
        bool shown = false;
        const auto showOne = [&](const Record& record) {
            shown = true;
            show(record);
        };
        FeedStep result = step(showOne);
        while (result == FeedStep::Shown && !spent.hasExpired(budgetMs))
            result = step(showOne);
        return shown ? FeedStep::Shown : result;
    }

private:
    mutable QMutex m_mutex;
    QQueue<Record> m_items;
    bool m_closed = false;
};
