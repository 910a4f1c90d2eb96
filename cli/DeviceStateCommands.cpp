#include "DeviceStateCommands.h"

QVector<CliCommand> deviceStateCommands()
{
    return {};
}
