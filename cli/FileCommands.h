#pragma once

#include "CliCommand.h"

// The commands on a device's file system: list, copy both ways, install, run and delete.
QVector<CliCommand> fileCommands();
