#pragma once

#include <QMutex>
#include <QMutexLocker>
#include <QVector>

#include <atomic>

// The latest list a live page's worker has read from the device, handed to the page's tick.
// The worker offers every list it reads; only a list that differs from the held one replaces
// it and raises the changed flag, which the tick lowers when it takes the list. The tick takes
// a shared copy under the lock and merges outside it, so the worker never waits for a merge.
// Page and worker share it through a QSharedPointer, so a worker that outlives its page still
// writes into live memory.
template <typename Record>
class LiveSnapshot
{
public:
    // On the worker thread. same(held, fresh) says whether two lists show the same rows.
    // True when fresh replaced the held list.
    template <typename Same>
    bool offer(QVector<Record> fresh, Same&& same)
    {
        QMutexLocker lock(&m_mutex);
        m_answered = true;
        if (same(m_list, fresh))
            return false;
        m_list = std::move(fresh);
        m_changed = true;
        return true;
    }

    // On the GUI thread: the list when it changed since the last take, clearing the flag.
    bool take(QVector<Record>& list)
    {
        if (!m_changed)
            return false;
        QMutexLocker lock(&m_mutex);
        list = m_list;
        m_changed = false;
        return true;
    }

    // Whether the device has answered at least once.
    bool hasAnswered() const { return m_answered; }

private:
    QMutex m_mutex;
    QVector<Record> m_list;
    std::atomic<bool> m_changed{false};
    std::atomic<bool> m_answered{false};
};
