#include "GuiHeartbeat.h"

#include <QEventLoop>

#include <time.h>

#include <algorithm>

namespace {

qint64 threadCpuMs()
{
    timespec now {};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
    return qint64(now.tv_sec) * 1000 + now.tv_nsec / 1000000;
}

// Nearest rank: the smallest value that at least 99% of the values do not exceed.
qint64 percentile99(QVector<qint64> values)
{
    std::sort(values.begin(), values.end());
    return values.isEmpty() ? 0 : values.at(std::max(0, int(values.size() * 99 + 99) / 100 - 1));
}

qint64 most(const QVector<qint64>& values)
{
    return values.isEmpty() ? 0 : *std::max_element(values.cbegin(), values.cend());
}

} // namespace

GuiHeartbeat::GuiHeartbeat()
{
    m_timer.setTimerType(Qt::PreciseTimer);
    m_timer.setInterval(5);
    QObject::connect(&m_timer, &QTimer::timeout, [this] { beat(); });
}

void GuiHeartbeat::start()
{
    m_gaps.clear();
    m_cpu.clear();
    m_cpuAtBeat = threadCpuMs();
    m_sinceBeat.start();
    m_timer.start();
}

void GuiHeartbeat::stop()
{
    QEventLoop loop;
    QTimer::singleShot(0, &loop, &QEventLoop::quit);
    loop.exec();
    beat();
    m_timer.stop();
}

qint64 GuiHeartbeat::longest() const
{
    return most(m_gaps);
}

qint64 GuiHeartbeat::p99() const
{
    return percentile99(m_gaps);
}

qint64 GuiHeartbeat::cpuOfLongest() const
{
    const auto longestGap = std::max_element(m_gaps.cbegin(), m_gaps.cend());
    return longestGap == m_gaps.cend() ? 0 : m_cpu.at(longestGap - m_gaps.cbegin());
}

qint64 GuiHeartbeat::mostCpu() const
{
    return most(m_cpu);
}

qint64 GuiHeartbeat::p99Cpu() const
{
    return percentile99(m_cpu);
}

void GuiHeartbeat::beat()
{
    const qint64 cpu = threadCpuMs();
    m_gaps.append(m_sinceBeat.restart());
    m_cpu.append(cpu - m_cpuAtBeat);
    m_cpuAtBeat = cpu;
}
