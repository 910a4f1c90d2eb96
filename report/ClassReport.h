#pragma once

#include "DeviceData.h"
#include "IdRecord.h"
#include "Report.h"

#include <QStringList>
#include <QVector>

// The device's classes: a row's texts in the class list's column order, and the
// "zant-class-ids" document of rows in that order, headed by the device's version facts.
class ClassReport
{
public:
    enum Column
    {
        NameColumn,
        IdColumn,
        FamilyColumn,
        SubFamilyColumn,
        AvailableColumn,
        PathColumn
    };

    static QStringList cells(const IdRecord& record);
    static Report build(const QVector<QStringList>& rows, const DeviceData& device);
};
