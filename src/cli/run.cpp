#include "cli/commands.h"

QList<Command> RunCommands()
{
    return {};
}
