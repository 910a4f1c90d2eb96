#pragma once

#include "CliCommand.h"

// A device's whole state saved to one file, and the differences between two such states.
QVector<CliCommand> snapshotCommands();
