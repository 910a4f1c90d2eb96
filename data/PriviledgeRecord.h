#pragma once

#include <QString>

// One privilege of the device's enablement mode, or one entry of the privilege database.
struct PriviledgeRecord
{
    QString id;
    QString name;
    QString family;
    QString subFamily;

    bool operator==(const PriviledgeRecord& o) const
    {
        return id == o.id && name == o.name && family == o.family && subFamily == o.subFamily;
    }
};
