#pragma once

#include <QElapsedTimer>
#include <QTimer>
#include <QVector>

// A 5 ms timer on the GUI thread: every interval between two of its beats, so that a block
// of the event loop shows as a long one, each with the CPU time the GUI thread spent within
// it (on a busy machine that tells our own work from the time the scheduler gave to others).
class GuiHeartbeat
{
public:
    GuiHeartbeat();

    void start();
    // One more beat once the events already queued are handled, so that a block at the very
    // end counts too.
    void stop();

    qint64 longest() const;
    qint64 p99() const;
    // The GUI thread's CPU time within the longest gap.
    qint64 cpuOfLongest() const;
    // The most CPU time within any gap, and its 99th percentile.
    qint64 mostCpu() const;
    qint64 p99Cpu() const;
    int beats() const { return int(m_gaps.size()); }

private:
    void beat();

    QTimer m_timer;
    QElapsedTimer m_sinceBeat;
    qint64 m_cpuAtBeat = 0;
    QVector<qint64> m_gaps;
    QVector<qint64> m_cpu;
};
