#include "DeviceData.h"

QString DeviceData::hardwareValue(const QString& key, const QString& defaultValue) const
{
    return hardware.value(key, defaultValue);
}
