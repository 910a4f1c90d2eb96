#pragma once

#include "PageFeed.h"

#include <QElapsedTimer>
#include <QObject>
#include <QTimer>

// The single-shot tick of a page: the first tick after a page-specific delay, then backing
// off by IdleStep up to a page-specific cap while there is nothing to show, and re-armed at
// a short interval (0 or 1 ms) while records are waiting. One timer per page, so a re-arm
// replaces the pending tick instead of adding a second one (only armExtra adds one). Every
// arm is announced by armed(), which lets the pacing be checked without waiting for it.
// Busy ticks keep their rate: a timer wakes up to a millisecond late and a tick takes time
// itself, which would stretch "one record per millisecond" by a third; so each busy tick is
// due one interval after the previous one was due, and a late tick makes the next come
// sooner.
class TickPacer : public QObject
{
    Q_OBJECT

public:
    static constexpr int IdleStep = 100;

    TickPacer(int initialInterval, int idleCap, QObject* parent = nullptr);

    // Arms the first tick; the interval is left as it is.
    int armFirst(int delayMs);
    // Arms one more tick on a second timer, beside the pending one: a page that keeps its
    // ticking from construction adds a prompt tick when it starts. The extra tick does not
    // cancel the pending one; re-arming from either tick replaces the pending tick as usual.
    int armExtra(int delayMs);
    // Nothing to do: the interval grows by IdleStep, up to the cap.
    int armIdle();
    // Work is waiting: the interval becomes busyMs, counted from when the previous busy
    // tick was due (from now for the first of a run). Returns the delay armed.
    int armBusy(int busyMs);
    // Arms the tick that follows a feed step; false, with nothing armed, once drained.
    bool pace(FeedStep step, int busyMs);
    void stop();

    bool isArmed() const;
    int interval() const;
    // The delay of the most recent arm (the first tick's delay included); -1 before any.
    int lastArmed() const;

signals:
    void timeout();
    void armed(int intervalMs);

private:
    int arm(int ms);

    QTimer m_timer;
    QTimer m_extra;
    QElapsedTimer m_clock;
    bool m_busyRun = false;
    qint64 m_busyDueNs = 0; // when the last busy tick was due, on m_clock
    int m_interval;
    int m_idleCap;
    int m_lastArmed = -1;
};
