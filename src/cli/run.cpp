// The run command: one run path for one handset or several. The selection
// forms one queue shared by the handsets (a ShardedRun, with one handset when
// one is named), and the report is built from what this run recorded.

#include "cli/commands.h"
#include "cli/options.h"
#include "cli/progress.h"
#include "cli/report.h"
#include "cli/setup.h"
#include "cli/shardoptions.h"

#include "catalogue/testcase.h"
#include "catalogue/testmodule.h"
#include "common/clock.h"
#include "controller/harness.h"
#include "controller/shardedrun.h"
#include "environment/testdirectories.h"
#include "log/log.h"

#include <QDir>
#include <QFileInfo>
#include <QLockFile>
#include <QSet>
#include <QSysInfo>

#include <algorithm>
#include <atomic>
#include <csignal>
#include <memory>
#include <vector>

#include <unistd.h>

namespace {

// ---- Signals: the first stops the run after the module in hand, the second
// ends the process at once. ----

std::atomic<ShardedRun *> g_run{nullptr};
std::atomic<int> g_signals{0};

extern "C" void OnStopSignal(int)
{
    if (g_signals.fetch_add(1) > 0)
        _exit(ExitInterrupted);
    if (ShardedRun *run = g_run.load())
        run->Stop();
    static const char message[] = "\nharness run: stopping after the module in hand (signal again to end at once)\n";
    const ssize_t ignored = write(STDERR_FILENO, message, sizeof message - 1);
    (void)ignored;
}

// Catches SIGINT and SIGTERM while alive.
class StopOnSignal
{
public:
    explicit StopOnSignal(ShardedRun &run)
    {
        g_run = &run;
        struct sigaction action = {};
        action.sa_handler = OnStopSignal;
        sigemptyset(&action.sa_mask);
        sigaction(SIGINT, &action, &m_savedInt);
        sigaction(SIGTERM, &action, &m_savedTerm);
    }
    ~StopOnSignal()
    {
        g_run = nullptr;
        sigaction(SIGINT, &m_savedInt, nullptr);
        sigaction(SIGTERM, &m_savedTerm, nullptr);
    }
    StopOnSignal(const StopOnSignal &) = delete;
    StopOnSignal &operator=(const StopOnSignal &) = delete;

private:
    struct sigaction m_savedInt = {};
    struct sigaction m_savedTerm = {};
};

// The handsets the options name, by full name. An exact name wins; a text
// that is part of several names or descriptions is an error listing them.
// Without a name, the first listed handset.
bool ResolveTargets(const QStringList &wanted, bool allTargets, const QString &command, QStringList &names)
{
    QList<ConnectTarget> listed;
    Harness::ListTargets(listed);
    if (allTargets) {
        for (const ConnectTarget &handset : std::as_const(listed))
            names.append(handset.name);
    }
    for (const QString &text : wanted) {
        QStringList matches;
        for (const ConnectTarget &handset : std::as_const(listed)) {
            if (handset.name.compare(text, Qt::CaseInsensitive) == 0) {
                matches = QStringList{handset.name};
                break;
            }
            if (handset.name.contains(text, Qt::CaseInsensitive)
                || handset.description.contains(text, Qt::CaseInsensitive))
                matches.append(handset.name);
        }
        if (matches.isEmpty())
            return Fail(command, QStringLiteral("no handset matching '%1' (see 'harness targets')").arg(text));
        if (matches.size() > 1)
            return Fail(command,
                        QStringLiteral("'%1' matches several handsets: %2; name one of them")
                            .arg(text, matches.join(QStringLiteral(", "))));
        names.append(matches.constFirst());
    }
    if (wanted.isEmpty() && !allTargets && !listed.isEmpty())
        names.append(listed.constFirst().name);
    names.removeDuplicates();
    if (names.isEmpty())
        return Fail(command, QStringLiteral("no handset attached (see 'harness targets')"));
    return true;
}

// A named handset must answer now: a run never switches to another one.
bool Reachable(const QString &name, const QString &command)
{
    QList<ConnectTarget> listed;
    Harness::ListTargets(listed);
    for (const ConnectTarget &handset : std::as_const(listed)) {
        if (handset.name != name)
            continue;
        Harness probe;
        if (!probe.ConnectToTarget(handset))
            break;
        probe.DisconnectTarget();
        return true;
    }
    return Fail(command, QStringLiteral("handset %1 is offline or unreachable").arg(name));
}

// Holds the run lock of one handset for the whole run.
std::unique_ptr<QLockFile> LockHandset(const QString &name, bool wait, const QString &command)
{
    auto lock = std::make_unique<QLockFile>(TestDirectories::GetTargetDirectory(name) + QStringLiteral("/run.lock"));
    lock->setStaleLockTime(0); // a live holder keeps it however long its run takes
    if (lock->tryLock(0))
        return lock;
    qint64 pid = 0;
    QString host;
    QString application;
    lock->getLockInfo(&pid, &host, &application);
    if (lock->error() == QLockFile::LockFailedError && wait) {
        Err(command + QStringLiteral(": handset %1 is in use by process %2; waiting\n").arg(name).arg(pid));
        if (lock->lock())
            return lock;
    }
    if (lock->error() == QLockFile::LockFailedError)
        Fail(command, QStringLiteral("handset %1 is in use by process %2").arg(name).arg(pid));
    else
        Fail(command, QStringLiteral("cannot lock handset %1 in %2").arg(name, lock->fileName()));
    return {};
}

// The damaged copies kept beside a processed-results file.
QStringList DamagedCopies(const QString &resultsPath)
{
    const QFileInfo info(resultsPath);
    QStringList copies = QDir(info.absolutePath())
                             .entryList({info.fileName() + QStringLiteral(".unreadable-*")}, QDir::Files, QDir::Name);
    for (QString &copy : copies)
        copy = info.absolutePath() + QLatin1Char('/') + copy;
    return copies;
}

// The modules a processed-results file shows with every test case passed,
// by lower-cased name.
QSet<QString> PassedModules(const RunReport &history)
{
    QSet<QString> names;
    for (const ModuleReport &module : history.modules) {
        if (!module.testCases.isEmpty() && module.Count(QStringLiteral("pass")) == module.testCases.size())
            names.insert(module.name.toLower());
    }
    return names;
}

// The report row of one module of this run.
ModuleReport RowOf(const ShardedRun::ModuleResult &result, const QSharedPointer<_TestModule> &module, bool stopped)
{
    ModuleReport row;
    row.name = result.name;
    row.source = result.source;
    row.host = QSysInfo::machineHostName();
    if (module) {
        row.family = module->family;
        row.subFamily = module->subFamily;
    }
    const ModuleRecord &record = result.record;
    const bool taken = !record.name.isEmpty();
    row.handset = taken ? record.handset : result.handset;
    if (taken) {
        row.start = record.start;
        row.durationMs = record.durationMs;
        row.logs = record.logs;
    }
    if (result.ran && result.outcome == ModuleSource::Recorded && record.parsed) {
        QHash<QString, qint64> times;
        for (const QString &log : record.logs)
            times.insert(CaseTimes(log));
        for (const TestCaseResult &verdict : record.results.caseResults) {
            TestCaseReport testCase{verdict.testCase, verdict.result, QString(), times.value(verdict.testCase, -1)};
            for (qsizetype i = 0;
                 testCase.result == QLatin1String("fail") && testCase.detail.isEmpty() && i < record.logs.size(); ++i)
                testCase.detail = VerdictLines(record.logs.at(i), verdict.testCase, verdict.result);
            row.testCases.append(testCase);
        }
        return row;
    }
    if (module) {
        for (const TestCase &testCase : std::as_const(module->testCases))
            row.testCases.append({testCase.name, QStringLiteral("unexecuted"), QString()});
    }
    if (result.ran)
        row.reason = record.Reason();
    else if (taken)
        row.reason = QStringLiteral("handset lost");
    else if (stopped)
        row.reason = QStringLiteral("interrupted before it ran");
    else
        row.reason = QStringLiteral("not run: every handset was lost");
    return row;
}

// The modules as the run takes them: run order, each name and source once.
QList<QSharedPointer<_TestModule>> RunOrder(QList<QSharedPointer<_TestModule>> modules)
{
    Harness::SortForRun(modules);
    QSet<QString> seen;
    QList<QSharedPointer<_TestModule>> order;
    for (const QSharedPointer<_TestModule> &module : std::as_const(modules)) {
        const QString key = module->Source() + QLatin1Char('/') + module->moduleName.toLower();
        if (!seen.contains(key)) {
            seen.insert(key);
            order.append(module);
        }
    }
    return order;
}

// What a dry run prints: the handsets, the modules in run order and what
// the options change about them.
QString Plan(const QList<QSharedPointer<_TestModule>> &order, const QStringList &handsets, const QStringList &retried,
             const QStringList &testCases, double timeoutSeconds)
{
    QString text = QStringLiteral("Dry run: nothing is installed or started.\n");
    text += handsets.size() == 1
        ? QStringLiteral("%1 on %2, in this order:\n")
              .arg(order.size() == 1 ? QStringLiteral("1 module") : QStringLiteral("%1 modules").arg(order.size()),
                   handsets.constFirst())
        : QStringLiteral(
              "%1 shared by %2 (one queue in this order; each handset takes the next module when it is free):\n")
              .arg(order.size() == 1 ? QStringLiteral("1 module") : QStringLiteral("%1 modules").arg(order.size()),
                   handsets.join(QStringLiteral(", ")));
    int width = 0;
    for (const QSharedPointer<_TestModule> &module : order)
        width = qMax(width, int(module->moduleName.size()));
    const int digits = int(QString::number(order.size()).size());
    for (qsizetype i = 0; i < order.size(); ++i) {
        const QSharedPointer<_TestModule> &module = order.at(i);
        text += QStringLiteral("%1. %2  %3  %4  %5\n")
                    .arg(i + 1, digits)
                    .arg(module->moduleName.leftJustified(width), module->TestType(), module->Source(),
                         module->testCases.size() == 1 ? QStringLiteral("1 test case")
                                                       : QStringLiteral("%1 test cases").arg(module->testCases.size()));
    }
    if (!retried.isEmpty())
        text += QStringLiteral("--retry leaves out what the processed results show passed: %1\n")
                    .arg(retried.join(QStringLiteral(", ")));
    if (!testCases.isEmpty())
        text += QStringLiteral("Test cases of %1: %2\n")
                    .arg(order.constFirst()->moduleName, testCases.join(QStringLiteral(", ")));
    if (timeoutSeconds > 0)
        text += QStringLiteral("A module still running after %1 is stopped.\n")
                    .arg(DurationText(qint64(timeoutSeconds * 1000.0)));
    return text;
}

// The slowest modules of a run, longest first.
QString Slowest(const RunReport &report, int count)
{
    QList<const ModuleReport *> timed;
    for (const ModuleReport &module : report.modules) {
        if (module.durationMs >= 0 && module.start.isValid())
            timed.append(&module);
    }
    std::stable_sort(timed.begin(), timed.end(),
                     [](const ModuleReport *a, const ModuleReport *b) { return a->durationMs > b->durationMs; });
    QStringList parts;
    for (qsizetype i = 0; i < qMin<qsizetype>(count, timed.size()); ++i)
        parts.append(QStringLiteral("%1 %2").arg(timed.at(i)->name, DurationText(timed.at(i)->durationMs)));
    return parts.isEmpty() ? QString() : QStringLiteral("Slowest: %1\n").arg(parts.join(QStringLiteral(", ")));
}

int RunCommand(const QStringList &arguments)
{
    const QString command = arguments.at(0);
    QCommandLineParser parser;
    parser.setApplicationDescription(QStringLiteral(
        "Runs the selected test modules on one handset or shares them among several, and prints a summary "
        "of what this run recorded: every selected module once, with its handset, its verdicts, or why it "
        "did not run or finish. A handset is locked for the run; SIGINT or SIGTERM stops after the module "
        "in hand (a second one at once).\n"
        "Exit status: 0 all passed, 1 a test case failed or a selected module did not run or finish, "
        "2 bad usage or a set-up failure (found before anything runs), 130 stopped by a signal."));
    SetupOptions setup;
    SelectionOptions selection;
    ShardOptions shard;
    setup.AddTo(parser);
    selection.AddTo(parser);
    shard.AddTo(parser);
    const QCommandLineOption target(
        QStringLiteral("target"),
        QStringLiteral(
            "The handset: its name, or a part of one handset's name or description; several times to share the run."),
        QStringLiteral("T"));
    const QCommandLineOption testData(QStringLiteral("test-data"),
                                      QStringLiteral("Resource source of the test data to push."),
                                      QStringLiteral("FILE"));
    const QCommandLineOption dpk(QStringLiteral("dpk"), QStringLiteral("Device pack (default: the platform's)."),
                                 QStringLiteral("FILE"));
    const QCommandLineOption testCases(QStringLiteral("test-cases"),
                                       QStringLiteral("Run only these test cases of the first module in run order."),
                                       QStringLiteral("A,B"));
    const QCommandLineOption runOption(QStringLiteral("run-option"),
                                       QStringLiteral("Run option for OAT modules (auto, interactive, all)."),
                                       QStringLiteral("O"));
    const QCommandLineOption noDelete(QStringLiteral("no-delete"),
                                      QStringLiteral("Leave the modules installed on the handset."));
    const QCommandLineOption copyDelay(QStringLiteral("copy-delay"), QStringLiteral("Pause before copying each log."),
                                       QStringLiteral("MS"));
    const QCommandLineOption logDir(QStringLiteral("log-dir"),
                                    QStringLiteral("Folder for the copied logs (default: the handset's log folder; "
                                                   "with several handsets one sub-folder each)."),
                                    QStringLiteral("DIR"));
    const QCommandLineOption retry(
        QStringLiteral("retry"),
        QStringLiteral(
            "Run only the selected modules that no handset's processed results show with every test case passed."));
    const QCommandLineOption allTargets(
        QStringLiteral("all-targets"),
        QStringLiteral("Share the modules among every handset 'harness targets' lists."));
    const QCommandLineOption wait(QStringLiteral("wait"),
                                  QStringLiteral("Wait for a handset another run is using instead of failing."));
    const QCommandLineOption dryRun(QStringLiteral("dry-run"),
                                    QStringLiteral("Print what would run, on which handsets and in which order (after "
                                                   "--retry), and stop; no handset is touched."));
    const QCommandLineOption timeout(QStringLiteral("timeout"),
                                     QStringLiteral("Stop a module still running SECONDS after it started: it is "
                                                    "removed from the handset and reported as not finished."),
                                     QStringLiteral("SECONDS"));
    parser.addOptions({target, testData, dpk, testCases, runOption, noDelete, copyDelay, logDir, JUnitOption(),
                       JsonOption(), HtmlOption(), retry, allTargets, wait, dryRun, timeout});
    parser.addPositionalArgument(QStringLiteral("PATTERN"),
                                 QStringLiteral("Module name patterns ('*' at either end); each must match a module."),
                                 QStringLiteral("[PATTERN...]"));
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status))
        return status;

    // ---- Everything that can be checked is checked before anything runs. ----
    if (!setup.Check(parser, command) || !selection.Check(parser, command) || !CheckReportOutputs(parser, command))
        return ExitUsage;
    if (parser.isSet(copyDelay)) {
        bool ok = false;
        parser.value(copyDelay).toUInt(&ok);
        if (!ok)
            return Refuse(command, QStringLiteral("--copy-delay needs a number of milliseconds"));
    }
    // A week is more than any module may take; the limit keeps the
    // milliseconds far from overflowing.
    constexpr double kMaxTimeoutSeconds = 7 * 24 * 3600;
    double timeoutSeconds = 0;
    if (parser.isSet(timeout)) {
        bool ok = false;
        timeoutSeconds = parser.value(timeout).toDouble(&ok);
        if (!ok || !(timeoutSeconds > 0) || timeoutSeconds > kMaxTimeoutSeconds)
            return Refuse(
                command,
                QStringLiteral("--timeout needs a number of seconds above 0 and at most %1").arg(kMaxTimeoutSeconds));
    }
    static const QStringList kRunOptions{QStringLiteral("auto"), QStringLiteral("interactive"), QStringLiteral("all")};
    if (parser.isSet(runOption) && !kRunOptions.contains(parser.value(runOption).toLower()))
        return Refuse(
            command,
            QStringLiteral("unknown --run-option '%1' (auto, interactive or all)").arg(parser.value(runOption)));
    for (const QCommandLineOption *file : {&testData, &dpk}) {
        if (parser.isSet(*file) && !QFileInfo(parser.value(*file)).isFile())
            return Refuse(
                command,
                QStringLiteral("--%1: %2 does not exist").arg(file->names().constFirst(), parser.value(*file)));
    }
    if (parser.isSet(logDir) && !QDir().mkpath(parser.value(logDir)))
        return Refuse(command, QStringLiteral("cannot create the log folder %1").arg(parser.value(logDir)));

    // The selection comes first: it needs the catalogues, not a handset, so
    // a shard plan is printed without touching one. The Harness that makes
    // it runs on the first handset.
    // One log per handset, so that each names its handset on a shared
    // console; they all write the same file.
    Log log;
    log.SetLogPath(setup.LogPath(parser));
    log.SetVerbose(parser.isSet(setup.verbose));
    ConsoleFilter console(parser.isSet(setup.verbose));
    std::vector<std::unique_ptr<Log>> logs;
    std::vector<std::unique_ptr<Harness>> harnesses;
    harnesses.push_back(std::make_unique<Harness>());
    logs.push_back(std::make_unique<Log>());
    setup.Apply(parser, *harnesses.front(), *logs.front());
    QList<QSharedPointer<_TestModule>> modules;
    {
        const EchoToStandardError quiet(true);
        if (!selection.Select(*harnesses.front(), parser, command, modules))
            return ExitUsage;
    }
    if (modules.isEmpty())
        return Refuse(command, QStringLiteral("no test module selected (see 'harness modules')"));
    // This host's shard of the selection, or the plan of every shard.
    if (const int shardStatus = shard.Apply(parser, command, modules); shardStatus >= 0)
        return shardStatus;

    QStringList names;
    if (!ResolveTargets(parser.values(target), parser.isSet(allTargets), command, names))
        return ExitUsage;
    const bool dry = parser.isSet(dryRun);
    if (!parser.isSet(allTargets) && !dry) {
        for (const QString &name : std::as_const(names)) {
            if (!Reachable(name, command))
                return ExitUsage;
        }
    }
    std::vector<std::unique_ptr<QLockFile>> locks;
    for (const QString &name : std::as_const(names)) {
        if (dry)
            break;
        locks.push_back(LockHandset(name, parser.isSet(wait), command));
        if (!locks.back())
            return ExitUsage;
    }

    QMap<QString, QString> logFolders;
    for (const QString &name : std::as_const(names)) {
        if (name != names.constFirst()) {
            harnesses.push_back(std::make_unique<Harness>());
            logs.push_back(std::make_unique<Log>());
            setup.Apply(parser, *harnesses.back(), *logs.back());
        }
        Harness &harness = *harnesses.back();
        if (names.size() > 1)
            logs.back()->SetEchoPrefix(name + QStringLiteral(": "));
        harness.SetModuleTimeLimit(qint64(timeoutSeconds * 1000.0));
        harness.SetTarget(name);
        QString folder = TestDirectories::GetLogDirectory(name);
        if (parser.isSet(logDir)) {
            folder = QFileInfo(parser.value(logDir)).absoluteFilePath()
                + (names.size() > 1 ? QLatin1Char('/') + name : QString());
            QDir().mkpath(folder);
            harness.SetLogOutputPath(folder);
        }
        logFolders.insert(name, folder);
        if (parser.isSet(testData))
            harness.SetTestData(QFileInfo(parser.value(testData)).absoluteFilePath());
        if (parser.isSet(dpk))
            harness.SetDPK(QFileInfo(parser.value(dpk)).absoluteFilePath());
        harness.SetRunOption(parser.value(runOption));
        harness.SetNoDelete(parser.isSet(noDelete));
        if (parser.isSet(copyDelay))
            harness.SetCopyDelay(parser.value(copyDelay));
    }

    // The history of each handset: needed by --retry, and a damaged one is
    // said out loud.
    QMap<QString, QString> resultsPaths;
    QStringList damagedBefore;
    QSet<QString> passed;
    QStringList retried;
    for (const QString &name : std::as_const(names)) {
        const QString path = TestDirectories::GetProcessResultsPath(name);
        resultsPaths.insert(name, path);
        damagedBefore += DamagedCopies(path);
        if (!QFileInfo::exists(path))
            continue;
        RunReport history;
        QString error;
        if (!history.Read(path, &error)) {
            if (parser.isSet(retry))
                return Refuse(
                    command,
                    QStringLiteral("cannot retry: the processed results of %1 are unreadable (%2)").arg(name, error));
            Err(command
                + QStringLiteral(": warning: the processed results of %1 are unreadable (%2); "
                                 "this run starts a new file and keeps the damaged one aside\n")
                      .arg(name, error));
            continue;
        }
        passed.unite(PassedModules(history));
    }
    if (parser.isSet(retry)) {
        // What no handset's history shows passed runs again, modules that
        // never ran included.
        modules.erase(std::remove_if(modules.begin(), modules.end(),
                                     [&](const QSharedPointer<_TestModule> &m) {
                                         if (!passed.contains(m->moduleName.toLower()))
                                             return false;
                                         retried.append(m->moduleName);
                                         return true;
                                     }),
                      modules.end());
        if (modules.isEmpty()) {
            Out(QStringLiteral("Every selected module has passed on %1: nothing to retry.\n")
                    .arg(names.size() == 1 ? names.constFirst() : QStringLiteral("these handsets")));
            return ExitSuccess;
        }
    }

    const QStringList wantedCases = parser.value(testCases).split(QLatin1Char(','), Qt::SkipEmptyParts);
    if (!wantedCases.isEmpty()) {
        QList<QSharedPointer<_TestModule>> order = modules;
        Harness::SortForRun(order);
        const QSharedPointer<_TestModule> first = order.constFirst();
        for (const QString &wanted : wantedCases) {
            const bool known = std::any_of(first->testCases.cbegin(), first->testCases.cend(),
                                           [&](const TestCase &testCase) { return testCase.name == wanted; });
            if (!known)
                return Refuse(command,
                              QStringLiteral("module %1 (the first in run order) has no test case '%2'")
                                  .arg(first->moduleName, wanted));
        }
    }

    const QList<QSharedPointer<_TestModule>> order = RunOrder(modules);
    if (dry) {
        retried.sort(Qt::CaseInsensitive);
        Out(Plan(order, names, retried, wantedCases, timeoutSeconds));
        return ExitSuccess;
    }

    // ---- The run. ----
    const bool exportToOutput = ExportsToOutput(parser);
    int handsetWidth = 0;
    for (const QString &name : std::as_const(names))
        handsetWidth = qMax(handsetWidth, int(name.size()));
    int moduleWidth = 0;
    for (const QSharedPointer<_TestModule> &module : order)
        moduleWidth = qMax(moduleWidth, int(module->moduleName.size()));
    ProgressPrinter progress(exportToOutput ? stderr : stdout, int(order.size()), handsetWidth, moduleWidth);
    console.SetPrinter(&progress);
    ShardedRun run(&log);
    run.SetObserver(&progress);
    for (const std::unique_ptr<Harness> &harness : harnesses)
        run.AddHandset(harness.get());
    run.SetTestCases(wantedCases);
    RunReport report;
    report.host = QSysInfo::machineHostName();
    report.handsets = names;
    report.start = QDateTime::currentDateTimeUtc();
    const Clock::Timer elapsed;
    // Held until the command returns: a signal while the reports are
    // written only asks for what is being done anyway.
    const StopOnSignal stop(run);
    run.Run(modules);
    progress.Finish();
    console.SetPrinter(nullptr);
    // At a reduced time scale the handsets' clocks run ahead of this
    // thread's: the run took at least as long as its busiest handset.
    QMap<QString, qint64> busy;
    for (const ShardedRun::ModuleResult &result : run.Modules())
        busy[result.record.handset] += qMax<qint64>(result.record.durationMs, 0);
    report.durationMs = elapsed.Elapsed();
    for (const qint64 ms : std::as_const(busy))
        report.durationMs = qMax(report.durationMs, ms);
    report.interrupted = run.Stopped();
    for (const ShardedRun::ModuleResult &result : run.Modules()) {
        QSharedPointer<_TestModule> module;
        for (const QSharedPointer<_TestModule> &candidate : std::as_const(modules)) {
            if (candidate->moduleName == result.name && candidate->Source() == result.source)
                module = candidate;
        }
        report.modules.append(RowOf(result, module, run.Stopped()));
    }
    status = PublishReport(report, parser, true, [&] {
        return QStringLiteral("Elapsed: %1\n").arg(DurationText(report.durationMs)) + Slowest(report, 3);
    });

    QString text;
    for (const ShardedRun::HandsetResult &handset : run.Handsets()) {
        if (!handset.lost)
            continue;
        text += handset.connected
            ? QStringLiteral("Handset %1 dropped out at %2, after %3.\n")
                  .arg(handset.handset, handset.lostAt.toString(Qt::ISODateWithMs),
                       handset.modulesRun == 1 ? QStringLiteral("1 module")
                                               : QStringLiteral("%1 modules").arg(handset.modulesRun))
            : QStringLiteral("Handset %1 could not be connected (%2).\n")
                  .arg(handset.handset, handset.lostAt.toString(Qt::ISODateWithMs));
    }
    if (report.NotFinished() > 0)
        text += QStringLiteral("Run the modules that did not finish again with --retry.\n");
    for (const QString &name : std::as_const(names)) {
        text += QStringLiteral("Logs of %1: %2\nProcessed results of %1: %3\n")
                    .arg(name, logFolders.value(name), resultsPaths.value(name));
        for (const QString &copy : DamagedCopies(resultsPaths.value(name))) {
            if (!damagedBefore.contains(copy))
                text += QStringLiteral("The unreadable processed results of %1 were kept as %2\n").arg(name, copy);
        }
    }
    text += QStringLiteral("Library log: %1\n").arg(setup.LogPath(parser));
    (exportToOutput ? Err : Out)(text);
    if (status != ExitSuccess)
        return status;
    if (report.interrupted)
        return ExitInterrupted;
    return report.NotFinished() > 0 || report.Total(QStringLiteral("fail")) > 0 ? ExitTestFailed : ExitSuccess;
}

} // namespace

QList<Command> RunCommands()
{
    return {
        {"run", "Run test modules on handsets and report what this run recorded", RunCommand},
    };
}
