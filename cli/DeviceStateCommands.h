#pragma once

#include "CliCommand.h"

// The commands that write a device's state: its settings store, its processes with their
// threads, and the modules each process has loaded.
QVector<CliCommand> deviceStateCommands();
