#include "ToolCommands.h"

QVector<CliCommand> toolCommands()
{
    return {};
}
