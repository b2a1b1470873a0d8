#include "cli/commands.h"

QList<Command> DemoCommands()
{
    return {};
}
