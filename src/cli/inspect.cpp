#include "cli/commands.h"
#include "cli/options.h"

#include "common/stringhash.h"

namespace {

int HashCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(QStringLiteral(
        "Prints the string hash that names manifest caches, module ID hashes and cache files."));
    parser.addPositionalArgument(QStringLiteral("TEXT"), QStringLiteral("The text to hash."));
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 1, 1))
        return status;
    Out(StringHashName(parser.positionalArguments().at(0)) + QLatin1Char('\n'));
    return ExitSuccess;
}

} // namespace

QList<Command> InspectionCommands()
{
    return {
        {"hash", "Print the string hash of a text (\"#\" and its decimal value)", HashCommand},
    };
}
