#pragma once

#include "LoadedModuleInfo.h"
#include "Report.h"

#include <QVector>

// The modules each process has loaded, as the loaded modules page shows them: the
// "zant-loaded-modules" document, processes and modules in the device's (ascending id) order.
class LoadedModuleReport
{
public:
    static Report build(const QVector<LoadedModuleInfo>& processes);
};
