#include "TickPacer.h"

#include <algorithm>

TickPacer::TickPacer(int initialInterval, int idleCap, QObject* parent)
    : QObject(parent)
    , m_interval(initialInterval)
    , m_idleCap(idleCap)
{
    m_timer.setSingleShot(true);
    m_extra.setSingleShot(true);
    m_clock.start();
    connect(&m_timer, &QTimer::timeout, this, &TickPacer::timeout);
    connect(&m_extra, &QTimer::timeout, this, &TickPacer::timeout);
}

int TickPacer::armFirst(int delayMs)
{
    m_busyRun = false;
    return arm(delayMs);
}

int TickPacer::armExtra(int delayMs)
{
    m_extra.start(delayMs);
    emit armed(delayMs);
    return delayMs;
}

int TickPacer::armIdle()
{
    m_busyRun = false;
    m_interval = std::min(m_interval + IdleStep, m_idleCap);
    return arm(m_interval);
}

int TickPacer::armBusy(int busyMs)
{
    constexpr qint64 NsPerMs = 1000000;
    const qint64 now = m_clock.nsecsElapsed();
    // Another interval starts a run of its own.
    if (!m_busyRun || busyMs != m_interval)
        m_busyDueNs = now;
    m_busyRun = true;
    m_interval = busyMs;
    m_busyDueNs += qint64(busyMs) * NsPerMs;
    const qint64 waitNs = std::max<qint64>(0, m_busyDueNs - now);
    return arm(int((waitNs + NsPerMs - 1) / NsPerMs));
}

bool TickPacer::pace(FeedStep step, int busyMs)
{
    switch (step) {
    case FeedStep::Waiting:
        armIdle();
        return true;
    case FeedStep::Shown:
        armBusy(busyMs);
        return true;
    case FeedStep::Drained:
        break;
    }
    stop();
    return false;
}

void TickPacer::stop()
{
    m_busyRun = false;
    m_timer.stop();
    m_extra.stop();
}

bool TickPacer::isArmed() const
{
    return m_timer.isActive();
}

int TickPacer::interval() const
{
    return m_interval;
}

int TickPacer::lastArmed() const
{
    return m_lastArmed;
}

int TickPacer::arm(int ms)
{
    m_lastArmed = ms;
    m_timer.start(ms);
    emit armed(ms);
    return ms;
}
