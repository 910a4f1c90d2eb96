#include "ProcessTable.h"

#include <algorithm>

ProcessTable::ProcessTable(const QList<ProcessSpec>& resident, const QList<ProcessSpec>& transients,
                           const ProcessEvolutionSpec& evolution)
    : m_transients(transients)
    , m_evolution(evolution)
    , m_random(evolution.seed)
{
    for (const ProcessSpec& spec : resident)
        m_processes.append(makeProcess(spec, -1));
}

ProcessTable::Process ProcessTable::makeProcess(const ProcessSpec& spec, int remaining)
{
    Process process;
    process.name = spec.name;
    process.id = m_nextTaskId++;
    process.remaining = remaining;
    for (const ThreadSpec& t : spec.threads)
        process.threads.append({t.name, m_nextTaskId++, t.priority, t.state, false});
    for (const LoadedModuleSpec& m : spec.modules) {
        if (m.onDemand) {
            process.onDemand.append(m);
            continue;
        }
        process.modules.append({m.name, m.location, m.size, m_nextModuleId++, -1});
    }
    return process;
}

quint32 ProcessTable::start(const ProcessSpec& spec, int lifetime)
{
    m_processes.append(makeProcess(spec, std::max(1, lifetime)));
    return m_processes.last().id;
}

void ProcessTable::advanceTo(quint64 step)
{
    while (m_step < step)
        stepOnce();
}

void ProcessTable::stepOnce()
{
    ++m_step;
    for (auto it = m_processes.begin(); it != m_processes.end();) {
        if (it->remaining > 0 && --it->remaining == 0)
            it = m_processes.erase(it);
        else
            ++it;
    }
    if (!m_evolution.enabled)
        return;

    if (!m_transients.isEmpty() && m_processes.size() < m_evolution.maxProcesses && m_random.bounded(3) == 0) {
        const ProcessSpec& spec = m_transients.at(int(m_random.bounded(quint32(m_transients.size()))));
        start(spec, spec.lifetime + int(m_random.bounded(quint32(spec.lifetime) + 1)));
    }
    for (int change = 0; change < m_evolution.changesPerStep && !m_processes.isEmpty(); ++change) {
        Process& process = m_processes[int(m_random.bounded(quint32(m_processes.size())))];
        if (m_random.bounded(2) == 0 || process.onDemand.isEmpty())
            changeThreads(process);
        else
            toggleOnDemandModule(process);
    }
}

// Starts a worker thread, or ends the oldest one the simulation started.
void ProcessTable::changeThreads(Process& process)
{
    const auto dynamicCount = std::count_if(process.threads.cbegin(), process.threads.cend(),
                                            [](const Thread& t) { return t.dynamic; });
    const bool grow = dynamicCount == 0 || (dynamicCount < MaxDynamicThreads && m_random.bounded(2) == 0);
    if (grow) {
        const quint32 priority = process.threads.isEmpty() ? 100 : process.threads.first().priority;
        const QString base = process.threads.isEmpty() ? process.name : process.threads.first().name;
        process.threads.append({base + QStringLiteral(" worker"), m_nextTaskId++, priority, 1, true});
        return;
    }
    const auto oldest = std::find_if(process.threads.begin(), process.threads.end(),
                                     [](const Thread& t) { return t.dynamic; });
    process.threads.erase(oldest);
}

// Loads an on-demand module that is not loaded, or unloads one that is.
void ProcessTable::toggleOnDemandModule(Process& process)
{
    const int index = int(m_random.bounded(quint32(process.onDemand.size())));
    const auto loaded = std::find_if(process.modules.begin(), process.modules.end(),
                                     [index](const Module& m) { return m.specIndex == index; });
    if (loaded != process.modules.end()) {
        process.modules.erase(loaded);
        return;
    }
    const LoadedModuleSpec& spec = process.onDemand.at(index);
    process.modules.append({spec.name, spec.location, spec.size, m_nextModuleId++, index});
}
