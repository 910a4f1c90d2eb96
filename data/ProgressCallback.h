#pragma once

#include <QString>

// Progress reporting of long gateway operations: value -1 with maximum != -1 starts the
// range 0..maximum, value >= 0 is progress, a non-empty text names the step. Returning
// true asks the operation to stop.
typedef bool (*PortlexProgressCallback)(void* context, int value, int maximum, const QString& text);
