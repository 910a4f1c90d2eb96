#pragma once

#include "CliCommand.h"

// The commands that need no device, or only a module of one: a module's MIF entry, the
// platform class-id scan and the comparison of scans.
QVector<CliCommand> toolCommands();
