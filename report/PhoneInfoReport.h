#pragma once

#include "DeviceData.h"
#include "Report.h"

#include <QString>

// The device's facts as the phone information page shows them: the "phone-info" document
// of its hardware, device, Zant and media format sections, with the page's texts.
class PhoneInfoReport
{
public:
    // A size the device gives in bytes, formatted; anything but a plain non-negative
    // decimal number counts as 0 (a negative count would otherwise show as exabytes).
    static QString sizeText(const DeviceData& device, const QString& key);
    // A feature the device has: only the exact text "Yes" counts.
    static bool hasFeature(const DeviceData& device, const QString& key);

    static Report build(const DeviceData& device);
};
