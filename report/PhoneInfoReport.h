#pragma once

#include "DeviceData.h"
#include "Report.h"

#include <QString>

// The device's facts as the phone information page shows them: the "phone-info" document
// of its hardware, device, Zant and media format sections, with the page's texts.
class PhoneInfoReport
{
public:
    static Report build(const DeviceData& device);
};
