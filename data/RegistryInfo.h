#pragma once

#include <QString>

// One registry entry: a MIME type and the classes that handle it.
struct RegistryInfo
{
    QString mimeType;
    quint32 baseClassId = 0;
    quint32 handlerClassId = 0;
    quint32 priority = 0;
    quint32 moduleId = 0;   // the module that registered the entry
    bool active = false;
    bool restricted = false;

    bool operator==(const RegistryInfo& o) const
    {
        return mimeType == o.mimeType && baseClassId == o.baseClassId && handlerClassId == o.handlerClassId && priority == o.priority && moduleId == o.moduleId && active == o.active && restricted == o.restricted;
    }
};
