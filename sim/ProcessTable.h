#pragma once

#include "DeviceProfile.h"

#include <QList>
#include <QRandomGenerator>

// The device's running processes, with their threads and loaded modules. Time advances in
// steps; every step ages short-lived processes and, when the image asks for it, lets a
// seeded generator start and end processes, threads and on-demand modules. Ids come from
// ever-growing counters, so processes, threads and modules always ascend by id.
class ProcessTable
{
public:
    struct Thread
    {
        QString name;
        quint32 id = 0;
        quint32 priority = 0;
        quint32 state = 0;
        bool dynamic = false; // started by the simulation; may end again
    };

    struct Module
    {
        QString name;
        QString location;
        quint32 size = 0;
        quint32 id = 0;
        int specIndex = -1; // on-demand module of the process spec, else -1
    };

    struct Process
    {
        QString name;
        quint32 id = 0;
        int remaining = -1; // steps left for a transient process; -1 for resident ones
        QList<Thread> threads;
        QList<Module> modules;
        QList<LoadedModuleSpec> onDemand;
    };

    ProcessTable(const QList<ProcessSpec>& resident, const QList<ProcessSpec>& transients,
                 const ProcessEvolutionSpec& evolution);

    // Runs the steps up to and including step; earlier steps are never run twice.
    void advanceTo(quint64 step);
    quint64 currentStep() const { return m_step; }
    const QList<Process>& processes() const { return m_processes; }

    // Starts a process that ends after lifetime steps (at least one). Returns its id.
    quint32 start(const ProcessSpec& spec, int lifetime);

    static constexpr int MaxDynamicThreads = 4;

private:
    Process makeProcess(const ProcessSpec& spec, int remaining);
    void stepOnce();
    void changeThreads(Process& process);
    void toggleOnDemandModule(Process& process);

    QList<ProcessSpec> m_transients;
    ProcessEvolutionSpec m_evolution;
    QRandomGenerator m_random;
    QList<Process> m_processes;
    quint64 m_step = 0;
    quint32 m_nextTaskId = 1000;  // processes and threads share one id space
    quint32 m_nextModuleId = 1;
};
