#pragma once

#include "DeviceData.h"
#include "IdRecord.h"

#include <QString>

// What the gateway learns about a device when it connects. The pages only read it.
struct DeviceCache
{
    bool filled = false;       // the gateway has filled the record
    QString deviceName;
    QString connectionKind;    // "Simulator" or "USB"

    struct Platform
    {
        QString name;
        QString directory;
    } platform;

    IdRecordMap classes;
    IdRecordMap interfaces;
    DeviceData deviceData;
};
