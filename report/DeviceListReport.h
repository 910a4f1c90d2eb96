#pragma once

#include "Report.h"

#include <QList>
#include <QPair>
#include <QString>

// The devices the gateway reaches, as (display name, device id) in the gateway's order.
class DeviceListReport
{
public:
    static Report build(const QList<QPair<QString, QString>>& devices);
};
