#include "cli/commands.h"
#include "cli/options.h"
#include "cli/report.h"

#include "controller/harness.h"
#include "environment/platforms.h"

#include <algorithm>

namespace {

int ReportCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(QStringLiteral(
        "Prints the summary of a processed-results file and exports it as JUnit XML or JSON.\n"
        "Modules without any executed test case are left out unless --all is given.\n"
        "Exit status 1 when a test case failed."));
    parser.addPositionalArgument(QStringLiteral("RESULTS.xml"), QStringLiteral("The processed-results file."));
    const QCommandLineOption all(QStringLiteral("all"), QStringLiteral("Include modules that never ran."));
    parser.addOptions({JUnitOption(), JsonOption(), all});
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 1, 1))
        return status;

    RunReport report;
    QString error;
    if (!report.Read(parser.positionalArguments().at(0), &error)) {
        Err(QStringLiteral("harness report: %1\n").arg(error));
        return ExitUsage;
    }
    if (!parser.isSet(all))
        report.DropNotExecuted();
    const int published = PublishReport(report, parser, false);
    if (published != ExitSuccess)
        return published;
    return report.Total(QStringLiteral("fail")) > 0 ? ExitTestFailed : ExitSuccess;
}

int ListCommand(const QStringList &arguments, const QString &description,
                const std::function<QString()> &list)
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
                                           .arg(haveDefault && kit.path == chosen.path ? QLatin1Char('*') : QLatin1Char(' '))
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

QList<Command> RunCommands()
{
    return {
        {"kits", "List the installed test kits", KitsCommand},
        {"platforms", "List the installed professional platforms", PlatformsCommand},
        {"targets", "List the reachable handsets", TargetsCommand},
        {"report", "Summarise a processed-results file; export JUnit XML or JSON", ReportCommand},
    };
}
