#pragma once

#include "LiveSnapshot.h"
#include "PageWorkerThread.h"

#include <QSharedPointer>
#include <QVector>

#include <algorithm>

// Whether two lists of processes show the same rows: the same process ids in the same
// places, each with the same entry ids in the same places. Names, states and sizes are left
// out: a live page follows rows coming and going, not their texts.
template <typename Process, typename Entry>
bool sameIds(const QVector<Process>& a, const QVector<Process>& b, QVector<Entry> Process::*entries)
{
    if (a.size() != b.size())
        return false;
    for (qsizetype i = 0; i < a.size(); ++i) {
        const QVector<Entry>& left = a[i].*entries;
        const QVector<Entry>& right = b[i].*entries;
        if (a[i].id != b[i].id || left.size() != right.size())
            return false;
        if (!std::equal(left.cbegin(), left.cend(), right.cbegin(),
                        [](const Entry& x, const Entry& y) { return x.id == y.id; }))
            return false;
    }
    return true;
}

// The worker of a live page (ProcessViewThread, LoadedModuleViewThread): polls the device for
// as long as the page lives, offering every list it reads to the page's snapshot. After a
// change it polls again soon, then ever more slowly while nothing changes; the first failing
// poll ends it for good.
template <typename Process, typename Entry>
class LivePollThread : public PageWorkerThread
{
public:
    using Snapshot = QSharedPointer<LiveSnapshot<Process>>;

    static constexpr unsigned long ChangeDelayMs = 100;
    static constexpr unsigned long DelayStepMs = 100;
    static constexpr unsigned long DelayCapMs = 2000;

protected:
    LivePollThread(GatewayComponentWidget* page, Snapshot snapshot, QVector<Entry> Process::*entries,
                   const QString& updatingStatus)
        : PageWorkerThread(page)
        , m_snapshot(std::move(snapshot))
        , m_entries(entries)
        , m_updatingStatus(updatingStatus)
    {
    }

    // One device query, on the worker thread. 0 means success.
    virtual int poll(QVector<Process>& list) = 0;

private:
    void work() final
    {
        reportStatus(QStringLiteral("Querying Device Processes"), GatewayComponentWidget::Processing);
        unsigned long delay = 0;
        while (!isStopRequested()) {
            QVector<Process> fresh;
            const int result = poll(fresh);
            if (isStopRequested())
                return;
            if (result != 0) {
                reportStatus(GatewayComponentWidget::errorStatus(result), GatewayComponentWidget::Failed);
                requestStop();
                return;
            }
            const auto entries = m_entries;
            const bool changed = m_snapshot->offer(std::move(fresh), [entries](const QVector<Process>& a, const QVector<Process>& b) {
                return sameIds(a, b, entries);
            });
            if (changed)
                reportStatus(m_updatingStatus);
            delay = std::min(changed ? ChangeDelayMs : delay + DelayStepMs, DelayCapMs);
            pause(delay);
        }
    }

    Snapshot m_snapshot;
    QVector<Entry> Process::*m_entries;
    QString m_updatingStatus;
};
