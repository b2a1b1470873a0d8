// The kits, platforms and targets commands: what is installed and attached.

#include "cli/commands.h"
#include "cli/options.h"

#include "controller/harness.h"
#include "environment/platforms.h"

namespace {

int ListCommand(const QStringList &arguments, const QString &description, const std::function<QString()> &list)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(description);
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 0, 0))
        return status;
    Out(list());
    return ExitSuccess;
}

int KitsCommand(const QStringList &arguments)
{
    return ListCommand(arguments,
                       QStringLiteral("Lists the installed test kits (KESTIX_TESTSETS_ALL); the default "
                                      "(KESTIX_TESTSET) is marked with '*'."),
                       [] {
                           QList<TestKit> kits;
                           Harness::ListTestKits(kits);
                           TestKit chosen;
                           const bool haveDefault = GetDefaultTestKit(chosen);
                           QString text;
                           for (const TestKit &kit : kits)
                               text += QStringLiteral("%1 %2\t%3\n")
                                           .arg(haveDefault && kit.path == chosen.path ? QLatin1Char('*')
                                                                                       : QLatin1Char(' '))
                                           .arg(kit.name, kit.path);
                           return text;
                       });
}

int PlatformsCommand(const QStringList &arguments)
{
    return ListCommand(arguments,
                       QStringLiteral("Lists the installed professional platforms (KESTIX_PLATFORMS_ALL); the "
                                      "default (KESTIX_PLATFORM) is marked with '*'."),
                       [] {
                           QList<Platform> platforms;
                           GetProPlatforms(platforms);
                           QString text;
                           for (const Platform &platform : platforms)
                               text += QStringLiteral("%1 %2\t%3\n")
                                           .arg(platform.isDefault ? QLatin1Char('*') : QLatin1Char(' '))
                                           .arg(platform.name, platform.path);
                           return text;
                       });
}

int TargetsCommand(const QStringList &arguments)
{
    return ListCommand(arguments,
                       QStringLiteral("Lists the reachable handsets (emulated handsets under KESTIX_HANDSETS): "
                                      "name and description."),
                       [] {
                           QList<ConnectTarget> targets;
                           Harness::ListTargets(targets);
                           QString text;
                           for (const ConnectTarget &target : targets)
                               text += QStringLiteral("%1\t%2\n").arg(target.name, target.description);
                           return text;
                       });
}

} // namespace

QList<Command> ListingCommands()
{
    return {
        {"kits", "List the installed test kits", KitsCommand},
        {"platforms", "List the installed professional platforms", PlatformsCommand},
        {"targets", "List the reachable handsets", TargetsCommand},
    };
}
