#include "FileCommands.h"

QVector<CliCommand> fileCommands()
{
    return {};
}
