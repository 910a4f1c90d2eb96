#pragma once

#include "CliCommand.h"

// The commands that write what a device holds: its listing, facts, modules, classes,
// family tree, registry, settings, processes, loaded modules and the level check.
QVector<CliCommand> deviceReportCommands();
