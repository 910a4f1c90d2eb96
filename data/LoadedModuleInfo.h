#pragma once

#include <QString>
#include <QVector>

// One module loaded into a process.
struct LoadedModuleEntry
{
    QString name;
    QString location;       // device path the module was loaded from
    quint32 size = 0;
    quint32 id = 0;         // stable key between polls
    quint32 baseAddress = 0;
    quint32 refCount = 0;

    bool operator==(const LoadedModuleEntry& o) const
    {
        return name == o.name && location == o.location && size == o.size && id == o.id && baseAddress == o.baseAddress && refCount == o.refCount;
    }
};

// The modules one process has loaded, in ascending id order.
struct LoadedModuleInfo
{
    QString name;           // the process's name
    quint32 id = 0;         // the process's id
    QVector<LoadedModuleEntry> modules;

    bool operator==(const LoadedModuleInfo& o) const
    {
        return name == o.name && id == o.id && modules == o.modules;
    }
};
