#include "cli/commands.h"
#include "cli/options.h"
#include "cli/report.h"

#include "catalogue/testmodule.h"
#include "catalogue/testcase.h"
#include "controller/harness.h"
#include "controller/shardedrun.h"
#include "environment/testdirectories.h"
#include "log/log.h"

#include <QDir>
#include <QFileInfo>
#include <QSet>

#include <algorithm>
#include <functional>
#include <iostream>
#include <memory>
#include <vector>

namespace {

// Options that configure the Harness, shared by the commands that use one.
struct SetupOptions
{
    QCommandLineOption kit{QStringLiteral("kit"), QStringLiteral("Test kit: a path, or part of an installed kit's name (default: KESTIX_TESTSET)."), QStringLiteral("K")};
    QCommandLineOption platform{QStringLiteral("platform"), QStringLiteral("Platform: a path, or part of an installed platform's name."), QStringLiteral("P")};
    QCommandLineOption log{QStringLiteral("log"), QStringLiteral("Write the library's log to FILE (default: harness.log in the data folder)."), QStringLiteral("FILE")};
    QCommandLineOption verbose{QStringLiteral("verbose"), QStringLiteral("Echo every log message to the console.")};

    void AddTo(QCommandLineParser &parser) const { parser.addOptions({kit, platform, log, verbose}); }

    void Apply(const QCommandLineParser &parser, Harness &harness, Log &logger) const
    {
        QString logPath = parser.value(log);
        if (logPath.isEmpty())
            logPath = QFileInfo(TestDirectories::GetTestDataPath()).absolutePath() + QStringLiteral("/harness.log");
        logger.SetLogPath(logPath);
        logger.SetVerbose(parser.isSet(verbose));
        harness.SetLogger(&logger);
        if (parser.isSet(kit))
            harness.SetTestkit(parser.value(kit));
        if (parser.isSet(platform))
            harness.SetPlatform(parser.value(platform));
    }
};

// While alive, the library's console echo goes to standard error, so that
// what a command prints on standard output stays machine-readable.
class EchoToStandardError
{
public:
    EchoToStandardError() : m_saved(std::cout.rdbuf(std::cerr.rdbuf())) {}
    ~EchoToStandardError() { std::cout.rdbuf(m_saved); }
    EchoToStandardError(const EchoToStandardError &) = delete;
    EchoToStandardError &operator=(const EchoToStandardError &) = delete;

private:
    std::streambuf *m_saved;
};

const QCommandLineOption kFamily(QStringLiteral("family"), QStringLiteral("Select modules whose family contains F."), QStringLiteral("F"));
const QCommandLineOption kSubFamily(QStringLiteral("subfamily"), QStringLiteral("With --family: and whose sub-family contains S."), QStringLiteral("S"));
const QCommandLineOption kFeatures(QStringLiteral("features"), QStringLiteral("Select the modules named by a feature list file."), QStringLiteral("FILE"));

QList<QSharedPointer<_TestModule>> Select(Harness &harness, const QCommandLineParser &parser)
{
    QList<QSharedPointer<_TestModule>> modules;
    if (parser.isSet(kFeatures))
        harness.GetTestModules(modules, parser.value(kFeatures));
    else
        harness.GetTestModules(modules, parser.positionalArguments(), parser.value(kFamily), parser.value(kSubFamily));
    return modules;
}

int ModulesCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(QStringLiteral(
        "Lists the selectable test modules of the kit and platform catalogues: name, test type, family, "
        "sub-family, source and number of test cases. PATTERN may start or end with '*'."));
    SetupOptions setup;
    setup.AddTo(parser);
    parser.addOptions({kFamily, kSubFamily, kFeatures});
    parser.addPositionalArgument(QStringLiteral("PATTERN"), QStringLiteral("Module name patterns."), QStringLiteral("[PATTERN...]"));
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status))
        return status;
    Harness harness;
    Log log;
    setup.Apply(parser, harness, log);
    QList<QSharedPointer<_TestModule>> modules;
    {
        EchoToStandardError echo;
        modules = Select(harness, parser);
    }
    QString text = QStringLiteral("Name\tType\tFamily\tSubfamily\tSource\tTest cases\n");
    for (const QSharedPointer<_TestModule> &m : modules)
        text += QStringLiteral("%1\t%2\t%3\t%4\t%5\t%6\n")
                    .arg(m->moduleName, m->TestType(), m->family, m->subFamily, m->Source())
                    .arg(m->testCases.size());
    Out(text);
    return ExitSuccess;
}

int ManifestCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(QStringLiteral(
        "Scans the test kit and the platform again and writes their catalogues (to their caches, or to FILE)."));
    SetupOptions setup;
    setup.AddTo(parser);
    const QCommandLineOption output({QStringLiteral("o"), QStringLiteral("output")},
                                    QStringLiteral("Write the catalogue to FILE."), QStringLiteral("FILE"));
    parser.addOption(output);
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 0, 0))
        return status;
    Harness harness;
    Log log;
    setup.Apply(parser, harness, log);
    if (!parser.isSet(setup.kit) && !parser.isSet(setup.platform)) {
        harness.SetTestkit(QStringLiteral("*"));  // the default kit and platform
        harness.SetPlatform(QStringLiteral("*"));
    }
    if (!harness.GenerateManifest(parser.value(output))) {
        Err(arguments.at(0) + QStringLiteral(": no catalogue could be generated (see the log)\n"));
        return ExitUsage;
    }
    return ExitSuccess;
}

// The modules that a processed-results file shows with any test case not
// passed (failed or never executed), by lower-cased name.
QSet<QString> NotPassedModules(const QString &resultsPath)
{
    QSet<QString> names;
    RunReport report;
    QString error;
    if (!report.Read(resultsPath, &error))
        return names;
    for (const ModuleReport &module : report.modules) {
        if (module.Count(QStringLiteral("pass")) != module.testCases.size() || module.testCases.isEmpty())
            names.insert(module.name.toLower());
    }
    return names;
}

// Keeps the modules that no processed-results file shows with every test
// case passed. A handset without a results file has passed nothing.
void KeepNotPassed(QList<QSharedPointer<_TestModule>> &modules, const QStringList &resultsPaths)
{
    QSet<QString> notPassed;
    bool any = false;
    for (const QString &path : resultsPaths) {
        if (!QFileInfo(path).isFile())
            continue;
        const QSet<QString> here = NotPassedModules(path);
        notPassed = any ? notPassed.intersect(here) : here;
        any = true;
    }
    if (!any)
        return;
    modules.erase(std::remove_if(modules.begin(), modules.end(),
                                 [&](const QSharedPointer<_TestModule> &m) { return !notPassed.contains(m->moduleName.toLower()); }),
                  modules.end());
}

// The report rows of the modules run, in run order.
RunReport ReportOf(const QString &resultsPath, const QList<QSharedPointer<_TestModule>> &modules)
{
    RunReport all;
    QString error;
    all.Read(resultsPath, &error);
    RunReport report;
    for (const QSharedPointer<_TestModule> &module : modules) {
        ModuleReport row;
        row.name = module->moduleName;
        for (const ModuleReport &candidate : all.modules) {
            if (candidate.name.compare(module->moduleName, Qt::CaseInsensitive) == 0
                && (candidate.source.isEmpty() || candidate.source == module->Source())) {
                row = candidate;
                break;
            }
        }
        report.modules.append(row);
    }
    return report;
}

QString DefaultLibraryLog()
{
    return QFileInfo(TestDirectories::GetTestDataPath()).absolutePath() + QStringLiteral("/harness.log");
}

// What a run on several handsets needs beyond the Harness settings.
struct ShardedOptions
{
    QStringList arguments;
    QStringList targets;  // names or parts of names, as given
    bool allTargets = false;
    QString logDir;       // each handset logs into <logDir>/<handset>
    bool retry = false;
    QStringList testCases;
    QString libraryLog;
};

// The full names of the handsets the options ask for: every listed one, or
// for each given text the first listed handset whose name or description
// contains it (any letter case). Empty with a message when one is unknown.
QStringList ResolveTargets(const ShardedOptions &options)
{
    QList<ConnectTarget> listed;
    Harness::ListTargets(listed);
    QStringList names;
    if (options.allTargets) {
        for (const ConnectTarget &handset : listed)
            names.append(handset.name);
    }
    for (const QString &wanted : options.targets) {
        const QString lower = wanted.toLower();
        QString found;
        for (const ConnectTarget &handset : listed) {
            if (handset.name.toLower().contains(lower) || handset.description.toLower().contains(lower)) {
                found = handset.name;
                break;
            }
        }
        if (found.isEmpty()) {
            Err(options.arguments.at(0) + QStringLiteral(": no handset matching '%1' (see 'harness targets')\n").arg(wanted));
            return {};
        }
        names.append(found);
    }
    names.removeDuplicates();
    if (names.isEmpty())
        Err(options.arguments.at(0) + QStringLiteral(": no handset attached (see 'harness targets')\n"));
    return names;
}

// Runs the selection on several handsets at once and prints one summary
// naming the handset of every module.
// The exit status of a finished run: a test case that failed, or a module
// that never ran, fails it.
int RunStatus(const RunReport &report, bool allRan)
{
    const bool notExecuted = !allRan
        || std::any_of(report.modules.cbegin(), report.modules.cend(),
                       [](const ModuleReport &row) { return !row.Executed(); });
    return notExecuted || report.Total(QStringLiteral("fail")) > 0 ? ExitTestFailed : ExitSuccess;
}

int RunSharded(const QCommandLineParser &parser, const ShardedOptions &options,
               const std::function<void(Harness &, Log &, const QString &, const QString &)> &configure)
{
    const QStringList names = ResolveTargets(options);
    if (names.isEmpty())
        return ExitUsage;

    Log log;
    std::vector<std::unique_ptr<Harness>> harnesses;
    for (const QString &name : names) {
        harnesses.push_back(std::make_unique<Harness>());
        configure(*harnesses.back(), log, name,
                  options.logDir.isEmpty() ? QString() : options.logDir + QLatin1Char('/') + name);
    }
    QList<QSharedPointer<_TestModule>> modules = Select(*harnesses.front(), parser);
    QMap<QString, QString> resultsPaths;
    for (const QString &name : names)
        resultsPaths.insert(name, TestDirectories::GetProcessResultsPath(name));
    if (options.retry) {
        KeepNotPassed(modules, resultsPaths.values());
        if (modules.isEmpty()) {
            Out(QStringLiteral("Every selected module has passed on these handsets: nothing to retry.\n"));
            return ExitSuccess;
        }
    }
    if (modules.isEmpty()) {
        Err(options.arguments.at(0) + QStringLiteral(": no test module selected (see 'harness modules')\n"));
        return ExitUsage;
    }

    ShardedRun run(&log);
    for (const std::unique_ptr<Harness> &harness : harnesses)
        run.AddHandset(harness.get());
    run.SetTestCases(options.testCases);
    const bool allRan = run.Run(modules);

    // One row per module, from the results file of the handset that ran it;
    // modules that never ran keep their test cases unexecuted.
    QMap<QString, RunReport> byHandset;
    RunReport report;
    for (const ShardedRun::ModuleResult &result : run.Modules()) {
        ModuleReport row;
        row.name = result.name;
        row.source = result.source;
        if (!result.handset.isEmpty() && resultsPaths.contains(result.handset)) {
            if (!byHandset.contains(result.handset)) {
                QString error;
                byHandset[result.handset].Read(resultsPaths.value(result.handset), &error);
            }
            for (const ModuleReport &candidate : std::as_const(byHandset[result.handset].modules)) {
                if (candidate.name.compare(result.name, Qt::CaseInsensitive) == 0
                    && (candidate.source.isEmpty() || candidate.source == result.source)) {
                    row = candidate;
                    break;
                }
            }
        } else {
            for (const QSharedPointer<_TestModule> &module : std::as_const(modules)) {
                if (module->moduleName == result.name && module->Source() == result.source) {
                    row.family = module->family;
                    row.subFamily = module->subFamily;
                    for (const TestCase &testCase : std::as_const(module->testCases))
                        row.testCases.append({testCase.name, QStringLiteral("unexecuted")});
                    break;
                }
            }
        }
        row.handset = result.handset;
        report.modules.append(row);
    }
    const int status = PublishReport(report, parser, true);

    QString text;
    for (const ShardedRun::HandsetResult &handset : run.Handsets()) {
        if (!handset.lost)
            continue;
        text += handset.connected
                    ? QStringLiteral("Handset %1 dropped out at %2, after %3 modules; its work went to the other handsets.\n")
                          .arg(handset.handset, handset.lostAt.toString(Qt::ISODateWithMs))
                          .arg(handset.modulesRun)
                    : QStringLiteral("Handset %1 could not be connected (%2).\n")
                          .arg(handset.handset, handset.lostAt.toString(Qt::ISODateWithMs));
    }
    const QStringList notRun = run.NotRun();
    if (!notRun.isEmpty())
        text += QStringLiteral("Every handset dropped out. Modules that never ran (run again with --retry): %1\n")
                    .arg(notRun.join(QStringLiteral(", ")));
    for (const QString &name : names)
        text += QStringLiteral("Processed results of %1: %2\n").arg(name, resultsPaths.value(name));
    text += QStringLiteral("Library log: %1\n").arg(options.libraryLog);
    Out(text);
    if (status != ExitSuccess)
        return status;
    return RunStatus(report, allRan);
}

int RunCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(QStringLiteral(
        "Runs the selected test modules on a handset and prints a summary of their verdicts.\n"
        "Exit status: 0 all passed, 1 a test case failed or a module could not run, 2 bad usage or "
        "set-up failure (no kit, no module selected, no handset)."));
    SetupOptions setup;
    setup.AddTo(parser);
    const QCommandLineOption target(QStringLiteral("target"), QStringLiteral("The handset: full or partial name or description."), QStringLiteral("T"));
    const QCommandLineOption testData(QStringLiteral("test-data"), QStringLiteral("Resource source of the test data to push."), QStringLiteral("FILE"));
    const QCommandLineOption dpk(QStringLiteral("dpk"), QStringLiteral("Device pack (default: the platform's)."), QStringLiteral("FILE"));
    const QCommandLineOption testCases(QStringLiteral("test-cases"), QStringLiteral("Run only these test cases (of the first module)."), QStringLiteral("A,B"));
    const QCommandLineOption runOption(QStringLiteral("run-option"), QStringLiteral("Run option for OAT modules (auto, interactive, all)."), QStringLiteral("O"));
    const QCommandLineOption noDelete(QStringLiteral("no-delete"), QStringLiteral("Leave the modules installed on the handset."));
    const QCommandLineOption copyDelay(QStringLiteral("copy-delay"), QStringLiteral("Pause before copying each log."), QStringLiteral("MS"));
    const QCommandLineOption logDir(QStringLiteral("log-dir"), QStringLiteral("Folder for the copied logs (default: the handset's log folder)."), QStringLiteral("DIR"));
    const QCommandLineOption retry(QStringLiteral("retry"), QStringLiteral("Run only the modules that the handset's processed results show with a test case not passed (with several handsets: not passed on any of them)."));
    const QCommandLineOption allTargets(QStringLiteral("all-targets"), QStringLiteral("Share the modules among every handset 'harness targets' lists."));
    parser.addOptions({target, testData, dpk, kFamily, kSubFamily, kFeatures, testCases, runOption, noDelete,
                       copyDelay, logDir, JUnitOption(), JsonOption(), retry, allTargets});
    parser.addPositionalArgument(QStringLiteral("PATTERN"), QStringLiteral("Module name patterns ('*' at either end)."), QStringLiteral("[PATTERN...]"));
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status))
        return status;
    if (parser.isSet(copyDelay)) {
        bool ok = false;
        parser.value(copyDelay).toUInt(&ok);
        if (!ok) {
            Err(arguments.at(0) + QStringLiteral(": --copy-delay needs a number of milliseconds\n"));
            return ExitUsage;
        }
    }

    // Configures a Harness for one handset; logFolder empty keeps the
    // handset's own log folder.
    const auto configure = [&](Harness &harness, Log &log, const QString &name, const QString &logFolder) {
        setup.Apply(parser, harness, log);
        harness.SetTarget(name);
        if (!logFolder.isEmpty()) {
            QDir().mkpath(logFolder);
            harness.SetLogOutputPath(QFileInfo(logFolder).absoluteFilePath());
        }
        if (parser.isSet(testData))
            harness.SetTestData(parser.value(testData));
        if (parser.isSet(dpk))
            harness.SetDPK(parser.value(dpk));
        harness.SetRunOption(parser.value(runOption));
        harness.SetNoDelete(parser.isSet(noDelete));
        if (parser.isSet(copyDelay))
            harness.SetCopyDelay(parser.value(copyDelay));
    };

    if (parser.isSet(allTargets) || parser.values(target).size() > 1) {
        ShardedOptions options;
        options.arguments = arguments;
        options.targets = parser.values(target);
        options.allTargets = parser.isSet(allTargets);
        options.logDir = parser.value(logDir);
        options.retry = parser.isSet(retry);
        options.testCases = parser.value(testCases).split(QLatin1Char(','), Qt::SkipEmptyParts);
        options.libraryLog = parser.isSet(setup.log) ? parser.value(setup.log) : DefaultLibraryLog();
        return RunSharded(parser, options, configure);
    }

    Harness harness;
    Log log;
    configure(harness, log, parser.value(target), parser.value(logDir));

    QList<QSharedPointer<_TestModule>> modules = Select(harness, parser);
    if (!harness.ConnectToTarget(parser.value(target))) {
        Err(arguments.at(0) + QStringLiteral(": no handset%1 could be connected (see 'harness targets')\n")
                .arg(parser.isSet(target) ? QStringLiteral(" matching '%1'").arg(parser.value(target)) : QString()));
        return ExitUsage;
    }
    const QString handsetLogs = harness.GetDefaultLogFilePath();
    const QString resultsPath = handsetLogs + QStringLiteral("/ProcessedResults/ProcessedResults.xml");
    if (parser.isSet(retry)) {
        KeepNotPassed(modules, {resultsPath});
        if (modules.isEmpty()) {
            Out(QStringLiteral("Every selected module has passed on this handset: nothing to retry.\n"));
            return ExitSuccess;
        }
    }
    if (modules.isEmpty()) {
        Err(arguments.at(0) + QStringLiteral(": no test module selected (see 'harness modules')\n"));
        return ExitUsage;
    }
    if (parser.isSet(testCases))
        harness.SetTestCases(parser.value(testCases).split(QLatin1Char(','), Qt::SkipEmptyParts));
    for (const QSharedPointer<_TestModule> &module : modules)
        harness.AddTest(module);
    const bool ran = harness.Run();

    const RunReport report = ReportOf(resultsPath, modules);
    status = PublishReport(report, parser, false);
    Out(QStringLiteral("Logs: %1\nProcessed results: %2\nLibrary log: %3\n")
            .arg(parser.isSet(logDir) ? QFileInfo(parser.value(logDir)).absoluteFilePath() : handsetLogs, resultsPath,
                 parser.isSet(setup.log) ? parser.value(setup.log) : DefaultLibraryLog()));
    harness.DisconnectTarget();
    if (status != ExitSuccess)
        return status;
    return RunStatus(report, ran);
}

int ProcessCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(QStringLiteral(
        "Turns saved logs into processed results again, without a handset: every log below the log "
        "folder (sub-folders too) is recorded in one processed-results file."));
    SetupOptions setup;
    setup.AddTo(parser);
    const QCommandLineOption logDir(QStringLiteral("log-dir"), QStringLiteral("The folder of saved logs."), QStringLiteral("DIR"));
    const QCommandLineOption results(QStringLiteral("results"), QStringLiteral("The processed-results file (default: DIR/ProcessedResults/ProcessedResults.xml)."), QStringLiteral("FILE"));
    parser.addOptions({logDir, results, JUnitOption(), JsonOption()});
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 0, 0))
        return status;
    if (!parser.isSet(logDir) || !QFileInfo(parser.value(logDir)).isDir()) {
        Err(arguments.at(0) + QStringLiteral(": --log-dir must name a folder of saved logs\n"));
        return ExitUsage;
    }
    Harness harness;
    Log log;
    setup.Apply(parser, harness, log);
    const QString logs = QFileInfo(parser.value(logDir)).absoluteFilePath();
    harness.SetLogOutputPath(logs);
    QString resultsPath = logs + QStringLiteral("/ProcessedResults/ProcessedResults.xml");
    if (parser.isSet(results)) {
        resultsPath = QFileInfo(parser.value(results)).absoluteFilePath();
        harness.SetProcessedResultsPath(resultsPath);
    }
    if (!harness.Process(0)) {
        Err(arguments.at(0) + QStringLiteral(": the logs could not be processed (see the log)\n"));
        return ExitUsage;
    }
    RunReport report;
    QString error;
    if (!report.Read(resultsPath, &error)) {
        Err(arguments.at(0) + QStringLiteral(": %1\n").arg(error));
        return ExitUsage;
    }
    report.DropNotExecuted();
    status = PublishReport(report, parser, false);
    Out(QStringLiteral("Processed results: %1\n").arg(resultsPath));
    return status;
}

} // namespace

QList<Command> RunnerCommands()
{
    return {
        {"modules", "List the selectable test modules", ModulesCommand},
        {"manifest", "Regenerate the kit and platform catalogues", ManifestCommand},
        {"run", "Run test modules on a handset and summarise the verdicts", RunCommand},
        {"process", "Process saved logs again into a processed-results file", ProcessCommand},
    };
}
