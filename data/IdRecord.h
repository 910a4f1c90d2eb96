#pragma once

#include <QMap>
#include <QString>

// One class or interface id with its names. The name databases fill the first four
// fields; a device's class map fills all of them.
struct IdRecord
{
    QString id;
    QString name;
    QString family;
    QString subFamily;
    QString source;
    QString path;
    bool available = false;

    bool operator==(const IdRecord& o) const
    {
        return id == o.id && name == o.name && family == o.family && subFamily == o.subFamily && source == o.source && path == o.path && available == o.available;
    }
};

using IdRecordMap = QMap<QString, IdRecord>;
