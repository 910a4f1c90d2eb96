#pragma once

#include "RegistryInfo.h"
#include "Report.h"

#include <QStringList>
#include <QVector>

// The registry entries: a row's texts in the registry list's column order, and the
// "registrylist" document of rows in that order.
class RegistryReport
{
public:
    enum Column
    {
        ClassTypeColumn,
        ClassHandlerColumn,
        FlagsColumn,
        MimeTypeColumn
    };

    static QStringList cells(const RegistryInfo& entry);
    static Report build(const QVector<QStringList>& rows);
};
