#pragma once

#include "GatewayComponentWidget.h"

#include <QDeadlineTimer>
#include <QMutex>
#include <QThread>
#include <QWaitCondition>

#include <atomic>

// The background thread of a fetching page (ModuleListViewThread and its kin derive from
// it and implement work()). The worker reaches its page only through the report functions,
// which do nothing once the page has let it go, and shares its records with the page
// through a PageFeed; so a worker still stuck in a device call when its page is destroyed
// can finish later without touching freed memory.
class PageWorkerThread : public QThread
{
    Q_OBJECT

public:
    ~PageWorkerThread() override;

    void requestStop();
    bool isStopRequested() const;

    // Ends the worker on behalf of its page: asks it to stop, waits at most waitMs for it,
    // cuts it off from the page and schedules its deletion for when it has returned.
    // The caller must not use the object afterwards.
    void release(unsigned long waitMs);

protected:
    explicit PageWorkerThread(GatewayComponentWidget* page);

    // The page's work, on this thread. It should return soon after isStopRequested().
    virtual void work() = 0;

    // Sleeps ms milliseconds, waking early when asked to stop; false once stopping.
    bool pause(unsigned long ms);
    // The same until deadline. A worker that paces its steps advances one deadline by the
    // step each time: a sleep that ran over then shortens the next, and the steps keep
    // their rate instead of each losing the sleep's overrun.
    bool pauseUntil(const QDeadlineTimer& deadline);

    // Each returns false, doing nothing, once the page has let the worker go.
    bool reportStatus(const QString& status);
    bool reportState(GatewayComponentWidget::ComponentState state);
    bool reportStatus(const QString& status, GatewayComponentWidget::ComponentState state);
    bool reportTimedStatus(const QString& message);

private:
    void run() final;
    template <typename Action>
    bool withPage(Action action);

    mutable QMutex m_lock; // guards m_page and pairs with m_wake
    QWaitCondition m_wake;
    GatewayComponentWidget* m_page;
    std::atomic<bool> m_stop{false};
};
