#pragma once

#include "DeviceData.h"
#include "RegistryInfo.h"

#include <QString>

// The texts the pages show for values that are no text on the device, in one place: the
// pages, their exports and the command line all word a value through here.
// (Byte counts: formatSize in FormatSize.h.)
class DisplayText
{
public:
    // "Included", "Default", "Excluded", "Hard Excluded", else "Unknown:" and the value.
    static QString threadState(quint32 state);
    // "Active", "Restricted", both joined by " | ", or nothing.
    static QString registryFlags(const RegistryInfo& entry);
    // A level's class on the device: "Found" or "Not Found".
    static QString levelResult(bool available);
    // A class's name, family or sub-family when the databases have none: "unknown".
    static QString orUnknown(const QString& text);
    // A size the device gives in bytes under key, formatted; anything but a plain
    // non-negative decimal number counts as 0 (a negative count would otherwise show as exabytes).
    static QString deviceSize(const DeviceData& device, const QString& key);
    // The same size in bytes, as machine output carries it.
    static qint64 deviceBytes(const DeviceData& device, const QString& key);
    // A feature the device has: only the exact text "Yes" counts.
    static bool hasFeature(const DeviceData& device, const QString& key);
};
