#pragma once

#include <QHashFunctions>
#include <QString>

// One file-system volume of the device.
struct VolumeInfo
{
    QString friendlyName;
    QString mountPoint;
    quint64 volumeSize = 0;  // bytes
    quint64 freeSpace = 0;   // bytes
    bool mounted = false;
    bool removable = false;
    quint32 volumeId = 0;

    bool operator==(const VolumeInfo& o) const
    {
        return friendlyName == o.friendlyName && mountPoint == o.mountPoint && volumeSize == o.volumeSize && freeSpace == o.freeSpace && mounted == o.mounted && removable == o.removable && volumeId == o.volumeId;
    }
};

inline size_t qHash(const VolumeInfo& v, size_t seed = 0)
{
    return qHashMulti(seed, v.mountPoint, v.volumeId, v.friendlyName);
}
