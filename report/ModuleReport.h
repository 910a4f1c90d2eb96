#pragma once

#include "ModuleInfo.h"
#include "Report.h"

#include <QStringList>
#include <QVector>

// The installed modules: a row's texts in the module list's column order, and the
// "zant-modules" document of rows in that order.
class ModuleReport
{
public:
    enum Column
    {
        NameColumn,
        VersionColumn,
        TypeColumn,
        SignatureColumn,
        PathColumn,
        CopyrightColumn
    };

    static QStringList cells(const ModuleInfo& module);
    static Report build(const QVector<QStringList>& rows);
};
