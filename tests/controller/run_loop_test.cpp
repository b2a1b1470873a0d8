// The run loop's order, waits and messages, driven against an emulated handset with modules and frameworks that record
// what is asked of them.

#include "controllertest.h"

#include "catalogue/framework.h"
#include "common/clock.h"
#include "controller/modulesource.h"
#include "support/handsetfixture.h"

#include <QDir>
#include <QMap>
#include <QRegularExpression>
#include <QSet>

namespace {

// Notes a call in events and answers it with result.
bool Note(QStringList *events, const QString &call, bool result = true)
{
    events->append(call);
    return result;
}

class RecordingModule : public ScriptedModule
{
public:
    RecordingModule(const QString &name, const QString &type, QStringList *events)
        : ScriptedModule(name, type), m_events(events)
    {
        source = u"KVK"_s;
        Report(name, {{name + u"_1"_s, u"pass"_s}});
    }

    bool Run(IKestoDevice *, const QMap<QString, QString> &) override
    {
        seenTestCases = selectedTestCases;
        seenRunOption = runOption;
        return Note(m_events, u"run "_s + moduleName, runs);
    }
    bool IsLogComplete(IKestoDevice *device) override
    {
        pollTimes.append(Clock::Now());
        if (onPoll)
            onPoll(device);
        return pollTimes.size() >= pollsNeeded;
    }
    bool CopyLog(IKestoDevice *, QMap<QString, QString> &) override
    {
        copyTime = Clock::Now();
        return Note(m_events, u"copy "_s + moduleName, copies);
    }
    bool RemoveTest(IKestoDevice *) override { return Note(m_events, u"remove "_s + moduleName); }
    void PostProcess(QMap<QString, QString> &) override { Note(m_events, u"postprocess "_s + moduleName); }
    bool GetLogFilePaths(IKestoDevice *, QStringList &paths) override
    {
        paths << u"fs:/a.log"_s << u"fs:/b.log"_s;
        return true;
    }

    bool runs = true, copies = true;
    int pollsNeeded = 1;
    std::function<void(IKestoDevice *)> onPoll;
    QList<qint64> pollTimes;
    qint64 copyTime = 0;
    QStringList seenTestCases;
    QString seenRunOption;

private:
    QStringList *m_events;
};

class RecordingFramework : public _Framework
{
public:
    RecordingFramework(const QString &frameworkName, QStringList *events) : m_events(events) { name = frameworkName; }
    bool IsLoaded(IKestoDevice *) override { return onHandset; }
    bool Load(IKestoDevice *, QMap<QString, QString> &) override { return Note(m_events, u"load "_s + name, loads); }
    bool PostLoad(IKestoDevice *, QMap<QString, QString> &) override { return Note(m_events, u"postload "_s + name); }
    void Unload(IKestoDevice *, QMap<QString, QString> &) override { Note(m_events, u"unload "_s + name); }

    bool onHandset = false, loads = true;

private:
    QStringList *m_events;
};

// What the run tells its observer: the start and end of each module, what it waited for and how each ended.
struct Watcher : RunObserver
{
    void ModuleStarted(const ModuleRecord &record) override { events.append(u"start "_s + record.name); }
    void ModuleWaiting(const ModuleRecord &record, const QString &what, qint64 elapsedMs) override
    {
        EXPECT_GE(elapsedMs, lastElapsed);
        lastElapsed = elapsedMs;
        waits.insert(record.name + u' ' + what);
    }
    void ModuleEnded(const ModuleRecord &record) override
    {
        events.append(u"end "_s + record.name);
        ended.insert(record.name, record);
        lastElapsed = 0;
    }
    QStringList events;
    QSet<QString> waits;
    qint64 lastElapsed = 0;
    QMap<QString, ModuleRecord> ended;
};

// Hands out modules in the order given and records how each ended.
class RecordingSource : public ModuleSource
{
public:
    RecordingSource(const QList<QSharedPointer<_TestModule>> &modules, bool keep) : m_modules(modules), m_keep(keep) { }
    QSharedPointer<_TestModule> Next() override { return m_modules.isEmpty() ? nullptr : m_modules.takeFirst(); }
    void Finished(const QSharedPointer<_TestModule> &module, Outcome outcome) override
    {
        outcomes.append(module->moduleName + u' ' + QString::number(int(outcome)));
    }
    bool KeepFrameworks() const override { return m_keep; }

    QStringList outcomes;

private:
    QList<QSharedPointer<_TestModule>> m_modules;
    bool m_keep;
};

class RunLoopTest : public CatalogueHarnessTest
{
protected:
    void SetUp() override
    {
        m_handsets.AddHandset(u"phone"_s, u"Emulated phone"_s, u"arm"_s);
        m_harness.SetTarget(u"phone"_s);
        m_harness.SetLogOutputPath(m_dir.filePath(u"logs"_s));
        m_ctf.reset(new RecordingFramework(u"ctf"_s, &m_events));
        m_oat.reset(new RecordingFramework(u"oat"_s, &m_events));
        UseCatalogues({}, {});
        m_kit->frameworks.insert(m_ctf->name, m_ctf);
        m_kit->frameworks.insert(m_oat->name, m_oat);
        m_harness.SetRunObserver(&m_watcher);
    }

    void TearDown() override
    {
        m_harness.SetRunObserver(nullptr);
        m_harness.DisconnectTarget();
    }

    // A module queued for the run and known to the kit catalogue.
    QSharedPointer<RecordingModule> Queue(const QString &name, const QString &type)
    {
        QSharedPointer<RecordingModule> module(new RecordingModule(name, type, &m_events));
        module->idHash = u"#"_s + name;
        m_kit->testModules.insert(name.toLower(), module);
        m_harness.AddTest(module);
        return module;
    }

    HandsetFixture m_handsets;
    QStringList m_events;
    QSharedPointer<RecordingFramework> m_ctf, m_oat;
    Watcher m_watcher;
};

TEST_F(RunLoopTest, EmptyQueueFailsButModulesWithoutAFrameworkCountAsTakenInHand)
{
    EXPECT_FALSE(m_harness.Run());
    EXPECT_EQ(m_log.Text(), u"No modules to run."_s);
    Queue(u"Menu"_s, u"uitf"_s);
    Queue(u"Other"_s, u"uitf"_s);
    EXPECT_TRUE(m_harness.Run());
    EXPECT_TRUE(m_events.isEmpty());
    EXPECT_EQ(m_log.Text().count(u"Framework uitf not found.\n"_s), 2);
}

TEST_F(RunLoopTest, ModulesRunByTypeThenNameWithEachFrameworkLoadedOnceAndOneFoundLoadedLeftOnTheHandset)
{
    m_oat->onHandset = true;
    Queue(u"Zeta"_s, u"oat"_s);
    Queue(u"Beta"_s, u"ctf"_s);
    Queue(u"Alpha"_s, u"oat"_s);

    EXPECT_TRUE(m_harness.Run());
    EXPECT_EQ(m_events,
              (QStringList{"load ctf", "run Beta", "copy Beta", "remove Beta", "postprocess Beta", "unload ctf",
                           "postload oat", "run Alpha", "copy Alpha", "remove Alpha", "postprocess Alpha", "run Zeta",
                           "copy Zeta", "remove Zeta", "postprocess Zeta"}));
    const QString log = m_log.Text();
    EXPECT_TRUE(log.contains(u"Loading Framework ctf\nRunning KVK test Beta ID:Beta\n"
                             u"   Test Beta Run\n   Removing test Beta\nUnloading Framework ctf\n"_s));
    EXPECT_TRUE(log.contains(u"Harness::Run Framework oat already loaded"_s));
    const ResultsView view = ReadResults(Env().value(u"ProcessedResultsPath"_s));
    EXPECT_EQ(view.verdicts.value(u"Zeta/Zeta_1"_s), u"pass"_s);
    EXPECT_EQ(view.verdicts.value(u"Beta/Beta_1"_s), u"pass"_s);
}

TEST_F(RunLoopTest, UnknownFrameworkAndFailedStartSkipTheModuleAndTheRunGoesOn)
{
    Queue(u"Menu"_s, u"uitf"_s);
    QSharedPointer<RecordingModule> broken = Queue(u"Broken"_s, u"ctf"_s);
    broken->runs = false;
    Queue(u"Fine"_s, u"ctf"_s);
    QSharedPointer<RecordingModule> silent = Queue(u"Silent"_s, u"ctf"_s);
    silent->copies = false;

    EXPECT_TRUE(m_harness.Run());
    const QMap<QString, QString> reasons{{u"Menu"_s, u"no framework for test type uitf"_s},
                                         {u"Broken"_s, u"install or start failed"_s},
                                         {u"Fine"_s, QString()},
                                         {u"Silent"_s, u"no log was found"_s}};
    ASSERT_EQ(m_watcher.ended.keys(), reasons.keys());
    for (auto it = reasons.cbegin(); it != reasons.cend(); ++it) {
        const ModuleRecord &record = m_watcher.ended.value(it.key());
        EXPECT_EQ(record.Reason(), it.value()) << it.key().toStdString();
        EXPECT_EQ(record.handset, u"phone"_s);
        EXPECT_EQ(record.start.timeSpec(), Qt::UTC);
    }
    const ModuleRecord &fine = m_watcher.ended.value(u"Fine"_s);
    ASSERT_EQ(fine.results.caseResults.size(), 1);
    EXPECT_EQ(fine.results.caseResults.at(0).testCase, u"Fine_1"_s);
    EXPECT_EQ(m_events,
              (QStringList{"load ctf", "run Broken", "run Fine", "copy Fine", "remove Fine", "postprocess Fine",
                           "run Silent", "copy Silent", "unload ctf"}));
    const QString log = m_log.Text();
    EXPECT_TRUE(log.contains(u"Test Broken Failed\n"_s));
    EXPECT_TRUE(log.contains(u"   No logs found for Silent\n"_s));
    EXPECT_TRUE(log.contains(u"Framework uitf not found.\n"_s));
    EXPECT_FALSE(log.contains(u"Removing test Silent"_s));
}

TEST_F(RunLoopTest, NoDeleteKeepsModulesCopyDelayPausesBeforeEachCopyAndTestCasesGoToTheFirstModuleOnly)
{
    m_harness.SetNoDelete(true);
    m_harness.SetCopyDelay(u"1500"_s);
    m_harness.SetTestCases({u"t1"_s, u"t2"_s});
    m_harness.SetRunOption(u"-fast"_s);
    QSharedPointer<RecordingModule> second = Queue(u"B"_s, u"ctf"_s), first = Queue(u"A"_s, u"ctf"_s);

    EXPECT_TRUE(m_harness.Run());
    EXPECT_FALSE(m_events.join(u',').contains(u"remove"_s));
    EXPECT_EQ(m_log.Text().count(u"   Sleeping 1500 Milliseconds\n"_s), 2);
    for (const auto &module : {first, second}) {
        EXPECT_GE(module->copyTime - module->pollTimes.last(), 1500);
        EXPECT_EQ(module->seenRunOption, u"-fast"_s);
    }
    EXPECT_EQ(first->seenTestCases, (QStringList{u"t1"_s, u"t2"_s}));
    EXPECT_TRUE(second->seenTestCases.isEmpty());
    EXPECT_TRUE(HarnessTestAccess::TestCases(m_harness).isEmpty());
}

TEST_F(RunLoopTest, LogIsPolledEachSecondOrQuarterSecondOnSimulatorsAndCopiedAfterTenMinutesOrDroppedPastTheLimit)
{
    QSharedPointer<RecordingModule> slow = Queue(u"Slow"_s, u"ctf"_s);
    slow->pollsNeeded = 3;
    QSharedPointer<RecordingModule> never = Queue(u"Stuck"_s, u"ctf"_s);
    never->pollsNeeded = 1000000;

    EXPECT_TRUE(m_harness.Run());
    ASSERT_EQ(slow->pollTimes.size(), 3);
    EXPECT_GE(slow->pollTimes[1] - slow->pollTimes[0], 1000);
    EXPECT_LT(slow->pollTimes[1] - slow->pollTimes[0], 1250);
    // Ten minutes of one-second polls, then the log is copied as it is.
    EXPECT_GE(never->pollTimes.size(), 590);
    EXPECT_LE(never->pollTimes.size(), 602);
    EXPECT_TRUE(m_events.contains(u"copy Stuck"_s));

    // Simulators are polled every quarter second.
    m_handsets.AddHandset(u"sim"_s, QString(), u"win32"_s);
    m_harness.SetTarget(u"sim"_s);
    QSharedPointer<RecordingModule> simulated = Queue(u"M"_s, u"ctf"_s);
    simulated->pollsNeeded = 2;
    EXPECT_TRUE(m_harness.Run());
    ASSERT_EQ(simulated->pollTimes.size(), 2);
    EXPECT_GE(simulated->pollTimes[1] - simulated->pollTimes[0], 250);
    EXPECT_LT(simulated->pollTimes[1] - simulated->pollTimes[0], 500);

    // Past a time limit, a module is removed uncopied and the observer sees its wait.
    m_harness.SetTarget(u"phone"_s);
    m_events.clear();
    m_watcher.events.clear();
    QSharedPointer<RecordingModule> stuck = Queue(u"Stopped"_s, u"ctf"_s);
    stuck->pollsNeeded = 1000000;
    m_harness.SetModuleTimeLimit(5000);
    RecordingSource source({stuck, Queue(u"Zeta"_s, u"ctf"_s)}, false);
    ASSERT_TRUE(m_harness.Run(source));
    EXPECT_EQ(m_watcher.events, (QStringList{u"start Stopped"_s, u"end Stopped"_s, u"start Zeta"_s, u"end Zeta"_s}));
    EXPECT_TRUE(m_watcher.waits.contains(u"Stopped its log"_s));
    const ModuleRecord timedOut = m_watcher.ended.value(u"Stopped"_s);
    EXPECT_EQ(timedOut.outcome, ModuleSource::TimedOut);
    EXPECT_GT(timedOut.durationMs, 5000);
    EXPECT_LT(timedOut.durationMs, 6500);
    EXPECT_EQ(timedOut.Reason(), u"stopped after its time limit of 5 s"_s);
    EXPECT_LT(stuck->pollTimes.size(), 10);
    EXPECT_TRUE(m_events.contains(u"remove Stopped"_s));
    EXPECT_FALSE(m_events.contains(u"copy Stopped"_s));
    EXPECT_EQ(m_watcher.ended.value(u"Zeta"_s).outcome, ModuleSource::Recorded);
}

TEST_F(RunLoopTest, FrameworksAreFoundInAnyCaseButLoadedByTheirExactName)
{
    QSharedPointer<RecordingFramework> upper(new RecordingFramework(u"CTFX"_s, &m_events));
    m_kit->frameworks.insert(upper->name, upper);
    EXPECT_EQ(m_harness.GetFramework(u"ctfx"_s), upper);
    EXPECT_FALSE(m_harness.GetFramework(u"ctf-"_s));
    EXPECT_FALSE(m_harness.Load(u"ctfx"_s));
    EXPECT_TRUE(m_events.isEmpty());
    EXPECT_TRUE(m_harness.Load(u"CTFX"_s));
    QList<QSharedPointer<_Framework>> frameworks{upper};
    EXPECT_EQ(m_harness.ListFrameworks(frameworks), 3u);
    EXPECT_EQ(frameworks.first()->name, u"CTFX"_s);

    m_kit->frameworks.remove(upper->name);
    EXPECT_TRUE(m_harness.Unload());
    EXPECT_EQ(m_events, (QStringList{"load CTFX", "unload ctf", "unload oat"}));
    EXPECT_FALSE(m_harness.Unload(QSharedPointer<_Framework>()));
    EXPECT_FALSE(m_harness.Load(QSharedPointer<_Framework>()));
    m_ctf->loads = false;
    EXPECT_FALSE(m_harness.Load(m_ctf));
    EXPECT_TRUE(m_log.Text().contains(u"Load Error: Kestix framework package for arm not found.\n"_s));
}

TEST_F(RunLoopTest, SecondaryModulesComeFromBothCataloguesBeforeTheModuleStartsAndByNameTheKitModuleRuns)
{
    QSharedPointer<RecordingModule> module(new RecordingModule(u"Main"_s, u"ctf"_s, &m_events));
    module->secondaryModules = {u"Both"_s, u"Nowhere"_s};
    for (Manifest *catalogue : {m_kit.data(), m_platform.data()}) {
        QSharedPointer<RecordingModule> both(new RecordingModule(u"Both"_s, u"secondary"_s, &m_events));
        catalogue->testModules.insert(u"both"_s, both);
    }

    EXPECT_TRUE(m_harness.Run(module));
    EXPECT_EQ(m_events, QStringList{u"run Main"_s});
    EXPECT_TRUE(m_log.Text().contains(QStringLiteral(
        "Loading Secondary Modules\n   Loading Secondary Module from KVK: Both\n"
        "   Loading Secondary Module from PVS: Both\n   Warning: Secondary Module Nowhere not found.\n")));
    EXPECT_FALSE(m_harness.Run(QSharedPointer<_TestModule>()));

    // By name, the kit's module runs.
    m_events.clear();
    Queue(u"Named"_s, u"ctf"_s);
    EXPECT_TRUE(m_harness.Run(u"NAMED"_s));
    EXPECT_FALSE(m_harness.Run(u"unknown"_s));
    EXPECT_EQ(m_events, QStringList{u"run Named"_s});
}

TEST_F(RunLoopTest, SourceRunKeepsFrameworksUntilTheEndWhenAsked)
{
    const QList<QSharedPointer<_TestModule>> modules{Queue(u"A"_s, u"ctf"_s), Queue(u"B"_s, u"oat"_s),
                                                     Queue(u"C"_s, u"ctf"_s), Queue(u"D"_s, u"uitf"_s)};
    RecordingSource keeping(modules, true);
    EXPECT_TRUE(m_harness.Run(keeping));
    EXPECT_EQ(m_events.filter(QRegularExpression(u"^(load|unload|run) "_s)),
              (QStringList{"load ctf", "run A", "load oat", "run B", "run C", "unload ctf", "unload oat"}));
    EXPECT_EQ(keeping.outcomes,
              (QStringList{u"A %1"_s.arg(ModuleSource::Recorded), u"B %1"_s.arg(ModuleSource::Recorded),
                           u"C %1"_s.arg(ModuleSource::Recorded), u"D %1"_s.arg(ModuleSource::NoFramework)}));

    // Without keeping, a framework goes as soon as another test type comes.
    m_events.clear();
    RecordingSource switching(modules.mid(0, 3), false);
    EXPECT_TRUE(m_harness.Run(switching));
    EXPECT_EQ(m_events.filter(QRegularExpression(u"^(load|unload|run) "_s)),
              (QStringList{"load ctf", "run A", "unload ctf", "load oat", "run B", "unload oat", "load ctf", "run C",
                           "unload ctf"}));
}

TEST_F(RunLoopTest, LostHandsetEndsTheRunWithoutUnloadingAndTheSourceLearnsWhichModuleItInterrupted)
{
    QSharedPointer<RecordingModule> first = Queue(u"A"_s, u"ctf"_s);
    first->pollsNeeded = 5;
    first->onPoll = [this](IKestoDevice *device) {
        WriteFile(m_handsets.HandsetFolder(u"phone"_s) + u"/offline"_s, QByteArray());
        device->FileExists(u"fs:/anything"_s);
    };
    RecordingSource source({first, Queue(u"B"_s, u"ctf"_s)}, false);
    EXPECT_FALSE(m_harness.Run(source));
    EXPECT_EQ(m_events, (QStringList{"load ctf", "run A"}));
    EXPECT_TRUE(m_log.Text().endsWith(u"Device Connection has died."_s));
    EXPECT_EQ(source.outcomes, QStringList{u"A %1"_s.arg(ModuleSource::Interrupted)});
}

} // namespace
