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
    Shown,   // one record was shown: come back soon
    Drained  // everything delivered has been shown and nothing more will come
};

// How long one tick may go on showing records before it lets the event loop paint and
// handle input again.
constexpr int TickBudgetMs = 10;

// Records passed from a page's worker thread to its GUI thread. The worker appends and
// finally closes the feed; the GUI thread takes one record per tick. Every access takes
// the feed's mutex, and only for the single operation, so neither side ever waits for the
// other's device call or row filling. Page and worker share it through a QSharedPointer,
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

    // A tick that shows pending records for up to budgetMs, at least one when there is one:
    // a long list then costs one turn of the event loop, and one repaint, per batch instead
    // of per record. A tick that has shown something says so even when the queue ran dry,
    // so that the tick comes back soon rather than backing off.
    template <typename Show>
    FeedStep drain(Show&& show, int budgetMs = TickBudgetMs)
    {
        QElapsedTimer spent;
        spent.start();
        FeedStep result = step(show);
        while (result == FeedStep::Shown && !spent.hasExpired(budgetMs)) {
            const FeedStep next = step(show);
            if (next == FeedStep::Waiting)
                break;
            result = next;
        }
        return result;
    }

private:
    mutable QMutex m_mutex;
    QQueue<Record> m_items;
    bool m_closed = false;
};
