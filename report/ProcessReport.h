#pragma once

#include "ProcessInfo.h"
#include "Report.h"

#include <QString>
#include <QVector>

// The device's processes with their threads, as the threads page shows them: the
// "zant-processes" document, processes and threads in the device's (ascending id) order.
class ProcessReport
{
public:
    static Report build(const QVector<ProcessInfo>& processes);
};
