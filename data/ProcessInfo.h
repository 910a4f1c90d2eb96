#pragma once

#include <QString>
#include <QVector>

// One thread of a device process.
struct ThreadEntry
{
    QString name;
    quint32 id = 0;
    quint32 priority = 0;
    quint32 state = 0;        // 0 included, 1 default, 2 excluded, 3 hard excluded
    quint32 processId = 0;
    quint64 cpuTimeMs = 0;

    bool operator==(const ThreadEntry& o) const
    {
        return name == o.name && id == o.id && priority == o.priority && state == o.state && processId == o.processId && cpuTimeMs == o.cpuTimeMs;
    }
};

// One running process with its threads in ascending id order.
struct ProcessInfo
{
    QString name;
    quint32 id = 0;
    QVector<ThreadEntry> threads;

    bool operator==(const ProcessInfo& o) const
    {
        return name == o.name && id == o.id && threads == o.threads;
    }
};
