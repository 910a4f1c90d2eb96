#pragma once

#include "Report.h"
#include "_SettingsInfo.h"

#include <QVector>

// The device's settings store: the "zant-settings" document, one node element per store
// node (its name and path, then its values as name and value) in the order given. The
// nodes stand side by side rather than nested, their paths telling the nesting, so that
// every CSV line has the same fields.
class SettingsReport
{
public:
    static Report build(const QVector<_SettingsInfo>& nodes);
};
