// The run loop's order, waits and messages, driven against an emulated
// handset with modules and frameworks that record what is asked of them.

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

using controllertest::MakeCatalogue;
using controllertest::ScriptedModule;
using harnesstest::CapturedLog;
using testutil::EnvGuard;

class RecordingModule : public ScriptedModule
{
public:
    RecordingModule(const QString &name, const QString &type, QStringList *events)
        : ScriptedModule(name, type), m_events(events)
    {
        source = QStringLiteral("KVK");
        Report(name, {{name + QStringLiteral("_1"), QStringLiteral("pass")}});
    }

    bool Run(IKestoDevice *, const QMap<QString, QString> &) override
    {
        m_events->append(QStringLiteral("run ") + moduleName);
        seenTestCases = selectedTestCases;
        seenRunOption = runOption;
        return runs;
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
        m_events->append(QStringLiteral("copy ") + moduleName);
        return copies;
    }
    bool RemoveTest(IKestoDevice *) override
    {
        m_events->append(QStringLiteral("remove ") + moduleName);
        return true;
    }
    void PostProcess(QMap<QString, QString> &) override
    {
        m_events->append(QStringLiteral("postprocess ") + moduleName);
    }

    bool runs = true;
    bool copies = true;
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
    RecordingFramework(const QString &frameworkName, QStringList *events) : m_events(events)
    {
        name = frameworkName;
    }
    bool IsLoaded(IKestoDevice *) override { return onHandset; }
    bool Load(IKestoDevice *, QMap<QString, QString> &) override
    {
        m_events->append(QStringLiteral("load ") + name);
        return loads;
    }
    bool PostLoad(IKestoDevice *, QMap<QString, QString> &) override
    {
        m_events->append(QStringLiteral("postload ") + name);
        return true;
    }
    void Unload(IKestoDevice *, QMap<QString, QString> &) override
    {
        m_events->append(QStringLiteral("unload ") + name);
    }

    bool onHandset = false;
    bool loads = true;

private:
    QStringList *m_events;
};

class RunLoopTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(m_dir.isValid());
        m_handsets.AddHandset(QStringLiteral("phone"), QStringLiteral("Emulated phone"),
                              QStringLiteral("arm"));
        m_harness.SetLogger(m_log.log());
        m_harness.SetTarget(QStringLiteral("phone"));
        m_harness.SetLogOutputPath(m_dir.filePath(QStringLiteral("logs")));
        m_ctf.reset(new RecordingFramework(QStringLiteral("ctf"), &m_events));
        m_oat.reset(new RecordingFramework(QStringLiteral("oat"), &m_events));
        m_kit = MakeCatalogue(m_dir.filePath(QStringLiteral("kit")), false, {});
        m_kit->frameworks.insert(m_ctf->name, m_ctf);
        m_kit->frameworks.insert(m_oat->name, m_oat);
        HarnessControllerAccess::SetCatalogues(m_harness, m_kit, {});
    }

    void TearDown() override { m_harness.DisconnectTarget(); }

    // The handset goes offline while module's log is polled.
    void LoseHandsetWhilePolling(RecordingModule &module)
    {
        module.pollsNeeded = 5;
        module.onPoll = [this](IKestoDevice *device) {
            testutil::WriteFile(m_handsets.HandsetFolder(QStringLiteral("phone")) + QStringLiteral("/offline"),
                                QByteArray());
            device->FileExists(QStringLiteral("fs:/anything"));
        };
    }

    // A module queued for the run and known to the kit catalogue.
    QSharedPointer<RecordingModule> Queue(const QString &name, const QString &type)
    {
        QSharedPointer<RecordingModule> module(new RecordingModule(name, type, &m_events));
        module->idHash = QStringLiteral("#") + name;
        m_kit->testModules.insert(name.toLower(), module);
        m_harness.AddTest(module);
        return module;
    }

    QString ResultsPath()
    {
        return HarnessControllerAccess::Environment(m_harness).value(
            QStringLiteral("ProcessedResultsPath"));
    }

    QTemporaryDir m_dir;
    testutil::HandsetFixture m_handsets;
    CapturedLog m_log;
    Harness m_harness;
    QStringList m_events;
    QSharedPointer<RecordingFramework> m_ctf;
    QSharedPointer<RecordingFramework> m_oat;
    QSharedPointer<Manifest> m_kit;
};

TEST_F(RunLoopTest, EmptyQueueRunsNothing)
{
    EXPECT_FALSE(m_harness.Run());
    EXPECT_EQ(m_log.Text(), QStringLiteral("No modules to run."));
}

TEST_F(RunLoopTest, ModulesRunByTypeThenNameWithEachFrameworkLoadedOnce)
{
    Queue(QStringLiteral("Zeta"), QStringLiteral("oat"));
    Queue(QStringLiteral("Beta"), QStringLiteral("ctf"));
    Queue(QStringLiteral("Alpha"), QStringLiteral("oat"));

    EXPECT_TRUE(m_harness.Run());
    EXPECT_EQ(m_events,
              (QStringList{"load ctf", "run Beta", "copy Beta", "remove Beta", "postprocess Beta",
                           "unload ctf", "load oat", "run Alpha", "copy Alpha", "remove Alpha",
                           "postprocess Alpha", "run Zeta", "copy Zeta", "remove Zeta",
                           "postprocess Zeta", "unload oat"}));
    const QString log = m_log.Text();
    EXPECT_TRUE(log.contains(QStringLiteral("Loading Framework ctf\nRunning KVK test Beta ID:Beta\n"
                                            "   Test Beta Run\n   Removing test Beta\n")));
    EXPECT_TRUE(log.contains(QStringLiteral("Unloading Framework ctf\nLoading Framework oat\n")));
    EXPECT_TRUE(log.endsWith(QStringLiteral("Unloading Framework oat\n")));
    const controllertest::ResultsView view = controllertest::ReadResults(ResultsPath());
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Zeta/Zeta_1")), QStringLiteral("pass"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Beta/Beta_1")), QStringLiteral("pass"));
}

TEST_F(RunLoopTest, FrameworkFoundLoadedIsPostLoadedAndLeftOnTheHandset)
{
    m_oat->onHandset = true;
    Queue(QStringLiteral("A"), QStringLiteral("oat"));
    Queue(QStringLiteral("B"), QStringLiteral("ctf"));

    EXPECT_TRUE(m_harness.Run());
    EXPECT_EQ(m_events, (QStringList{"load ctf", "run B", "copy B", "remove B", "postprocess B",
                                     "unload ctf", "postload oat", "run A", "copy A", "remove A",
                                     "postprocess A"}));
    EXPECT_TRUE(m_log.Text().contains(QStringLiteral("Harness::Run Framework oat already loaded")));
}

TEST_F(RunLoopTest, UnknownFrameworkAndFailedStartSkipTheModuleAndTheRunGoesOn)
{
    Queue(QStringLiteral("Menu"), QStringLiteral("uitf"));
    QSharedPointer<RecordingModule> broken = Queue(QStringLiteral("Broken"), QStringLiteral("ctf"));
    broken->runs = false;
    Queue(QStringLiteral("Fine"), QStringLiteral("ctf"));
    QSharedPointer<RecordingModule> silent = Queue(QStringLiteral("Silent"), QStringLiteral("ctf"));
    silent->copies = false;
    // What the run tells its observer about each module it took.
    struct Records : RunObserver {
        QMap<QString, ModuleRecord> byName;
        void ModuleEnded(const ModuleRecord &record) override { byName.insert(record.name, record); }
    } records;
    m_harness.SetRunObserver(&records);

    EXPECT_TRUE(m_harness.Run());
    m_harness.SetRunObserver(nullptr);
    const QMap<QString, QString> reasons{{QStringLiteral("Menu"), QStringLiteral("no framework for test type uitf")},
                                         {QStringLiteral("Broken"), QStringLiteral("install or start failed")},
                                         {QStringLiteral("Fine"), QString()},
                                         {QStringLiteral("Silent"), QStringLiteral("no log was found")}};
    ASSERT_EQ(records.byName.keys(), reasons.keys());
    for (auto it = reasons.cbegin(); it != reasons.cend(); ++it) {
        const ModuleRecord &record = records.byName.value(it.key());
        EXPECT_EQ(record.Reason(), it.value()) << it.key().toStdString();
        EXPECT_EQ(record.handset, QStringLiteral("phone"));
        EXPECT_EQ(record.start.timeSpec(), Qt::UTC);
    }
    const ModuleRecord &fine = records.byName.value(QStringLiteral("Fine"));
    ASSERT_EQ(fine.results.caseResults.size(), 1);
    EXPECT_EQ(fine.results.caseResults.at(0).testCase, QStringLiteral("Fine_1"));
    EXPECT_EQ(m_events, (QStringList{"load ctf", "run Broken", "run Fine", "copy Fine", "remove Fine",
                                     "postprocess Fine", "run Silent", "copy Silent", "unload ctf"}));
    const QString log = m_log.Text();
    EXPECT_TRUE(log.contains(QStringLiteral("Test Broken Failed\n")));
    EXPECT_TRUE(log.contains(QStringLiteral("   No logs found for Silent\n")));
    EXPECT_TRUE(log.contains(QStringLiteral("Framework uitf not found.\n")));
    EXPECT_FALSE(log.contains(QStringLiteral("Removing test Silent")));
}

TEST_F(RunLoopTest, OnlyUnknownFrameworksStillCountAsTakenInHand)
{
    Queue(QStringLiteral("Menu"), QStringLiteral("uitf"));
    Queue(QStringLiteral("Other"), QStringLiteral("uitf"));
    EXPECT_TRUE(m_harness.Run());
    EXPECT_TRUE(m_events.isEmpty());
    EXPECT_EQ(m_log.Text().count(QStringLiteral("Framework uitf not found.\n")), 2);
}

TEST_F(RunLoopTest, NoDeleteKeepsModulesAndCopyDelayPausesBeforeEachCopy)
{
    m_harness.SetNoDelete(true);
    m_harness.SetCopyDelay(QStringLiteral("1500"));
    QSharedPointer<RecordingModule> a = Queue(QStringLiteral("A"), QStringLiteral("ctf"));
    QSharedPointer<RecordingModule> b = Queue(QStringLiteral("B"), QStringLiteral("ctf"));

    EXPECT_TRUE(m_harness.Run());
    EXPECT_FALSE(m_events.join(QLatin1Char(',')).contains(QStringLiteral("remove")));
    EXPECT_EQ(m_log.Text().count(QStringLiteral("   Sleeping 1500 Milliseconds\n")), 2);
    for (const auto &module : {a, b})
        EXPECT_GE(module->copyTime - module->pollTimes.last(), 1500);
}

TEST_F(RunLoopTest, TestCasesGoToTheFirstModuleOnlyAndTheRunOptionToAll)
{
    m_harness.SetTestCases({QStringLiteral("t1"), QStringLiteral("t2")});
    m_harness.SetRunOption(QStringLiteral("-fast"));
    QSharedPointer<RecordingModule> second = Queue(QStringLiteral("B"), QStringLiteral("ctf"));
    QSharedPointer<RecordingModule> first = Queue(QStringLiteral("A"), QStringLiteral("ctf"));

    EXPECT_TRUE(m_harness.Run());
    EXPECT_EQ(first->seenTestCases, (QStringList{QStringLiteral("t1"), QStringLiteral("t2")}));
    EXPECT_TRUE(second->seenTestCases.isEmpty());
    EXPECT_EQ(first->seenRunOption, QStringLiteral("-fast"));
    EXPECT_EQ(second->seenRunOption, QStringLiteral("-fast"));
    EXPECT_TRUE(HarnessControllerAccess::TestCases(m_harness).isEmpty());
}

TEST_F(RunLoopTest, LogIsPolledEverySecondOnHandsetsAndCopiedAfterTenMinutesAtMost)
{
    QSharedPointer<RecordingModule> slow = Queue(QStringLiteral("Slow"), QStringLiteral("ctf"));
    slow->pollsNeeded = 3;
    QSharedPointer<RecordingModule> never = Queue(QStringLiteral("Stuck"), QStringLiteral("ctf"));
    never->pollsNeeded = 1000000;

    EXPECT_TRUE(m_harness.Run());
    ASSERT_EQ(slow->pollTimes.size(), 3);
    EXPECT_GE(slow->pollTimes[1] - slow->pollTimes[0], 1000);
    EXPECT_LT(slow->pollTimes[1] - slow->pollTimes[0], 1250);
    // Ten minutes of one-second polls, then the log is copied as it is.
    EXPECT_GE(never->pollTimes.size(), 590);
    EXPECT_LE(never->pollTimes.size(), 602);
    EXPECT_TRUE(m_events.contains(QStringLiteral("copy Stuck")));
}

TEST_F(RunLoopTest, AModulePastTheTimeLimitIsRemovedUncopiedAndTheObserverSeesItsWait)
{
    QSharedPointer<RecordingModule> stuck = Queue(QStringLiteral("Stuck"), QStringLiteral("ctf"));
    stuck->pollsNeeded = 1000000;
    QSharedPointer<RecordingModule> next = Queue(QStringLiteral("Zeta"), QStringLiteral("ctf"));
    struct Watcher : RunObserver {
        void ModuleStarted(const ModuleRecord &record) override { events.append(QStringLiteral("start ") + record.name); }
        void ModuleWaiting(const ModuleRecord &record, const QString &what, qint64 elapsedMs) override
        {
            EXPECT_GE(elapsedMs, lastElapsed);
            lastElapsed = elapsedMs;
            waits.insert(record.name + QLatin1Char(' ') + what);
        }
        void ModuleEnded(const ModuleRecord &record) override
        {
            events.append(QStringLiteral("end ") + record.name);
            ended.insert(record.name, record);
            lastElapsed = 0;
        }
        QStringList events;
        QSet<QString> waits;
        qint64 lastElapsed = 0;
        QMap<QString, ModuleRecord> ended;
    } watcher;
    m_harness.SetRunObserver(&watcher);
    m_harness.SetModuleTimeLimit(5000);
    EXPECT_TRUE(m_harness.Run());
    m_harness.SetRunObserver(nullptr);

    EXPECT_EQ(watcher.events, (QStringList{QStringLiteral("start Stuck"), QStringLiteral("end Stuck"),
                                           QStringLiteral("start Zeta"), QStringLiteral("end Zeta")}));
    EXPECT_TRUE(watcher.waits.contains(QStringLiteral("Stuck its log")));
    const ModuleRecord timedOut = watcher.ended.value(QStringLiteral("Stuck"));
    EXPECT_EQ(timedOut.outcome, ModuleSource::TimedOut);
    EXPECT_GT(timedOut.durationMs, 5000);
    EXPECT_LT(timedOut.durationMs, 6500);
    EXPECT_EQ(timedOut.Reason(), QStringLiteral("stopped after its time limit of 5 s"));
    EXPECT_LT(stuck->pollTimes.size(), 10);
    EXPECT_TRUE(m_events.contains(QStringLiteral("remove Stuck")));
    EXPECT_FALSE(m_events.contains(QStringLiteral("copy Stuck")));
    EXPECT_EQ(watcher.ended.value(QStringLiteral("Zeta")).outcome, ModuleSource::Recorded);
}

TEST(RunLoopSimulator, SimulatorHandsetsArePolledEveryQuarterSecond)
{
    QTemporaryDir dir;
    testutil::HandsetFixture handsets;
    handsets.AddHandset(QStringLiteral("sim"), QString(), QStringLiteral("win32"));
    QStringList events;
    Harness harness;
    harness.SetTarget(QStringLiteral("sim"));
    harness.SetLogOutputPath(dir.filePath(QStringLiteral("logs")));
    QSharedPointer<Manifest> kit = MakeCatalogue(dir.filePath(QStringLiteral("kit")), false, {});
    kit->frameworks.insert(QStringLiteral("ctf"), QSharedPointer<_Framework>(new RecordingFramework(
                                                      QStringLiteral("ctf"), &events)));
    HarnessControllerAccess::SetCatalogues(harness, kit, {});
    QSharedPointer<RecordingModule> module(new RecordingModule(QStringLiteral("M"), QStringLiteral("ctf"), &events));
    module->pollsNeeded = 2;
    harness.AddTest(module);

    EXPECT_TRUE(harness.Run());
    ASSERT_EQ(module->pollTimes.size(), 2);
    EXPECT_GE(module->pollTimes[1] - module->pollTimes[0], 250);
    EXPECT_LT(module->pollTimes[1] - module->pollTimes[0], 500);
    harness.DisconnectTarget();
}

TEST_F(RunLoopTest, LostHandsetEndsTheRunWithoutUnloading)
{
    QSharedPointer<RecordingModule> first = Queue(QStringLiteral("A"), QStringLiteral("ctf"));
    LoseHandsetWhilePolling(*first);
    Queue(QStringLiteral("B"), QStringLiteral("ctf"));

    EXPECT_FALSE(m_harness.Run());
    EXPECT_EQ(m_events, (QStringList{"load ctf", "run A"}));
    EXPECT_TRUE(m_log.Text().endsWith(QStringLiteral("Device Connection has died.")));
}

TEST_F(RunLoopTest, RunFailsWithoutAHandset)
{
    Queue(QStringLiteral("A"), QStringLiteral("ctf"));
    m_harness.SetTarget(QStringLiteral("nothing-like-this"));
    EXPECT_FALSE(m_harness.Run());
    EXPECT_TRUE(m_events.isEmpty());
    EXPECT_TRUE(m_log.Text().contains(QStringLiteral("Target nothing-like-this not found.")));
}

TEST_F(RunLoopTest, FrameworkLookupIgnoresCaseButLoadByNameDoesNot)
{
    QSharedPointer<RecordingFramework> upper(new RecordingFramework(QStringLiteral("CTFX"), &m_events));
    m_kit->frameworks.insert(upper->name, upper);
    EXPECT_EQ(m_harness.GetFramework(QStringLiteral("ctfx")), upper);
    EXPECT_FALSE(m_harness.GetFramework(QStringLiteral("ctf-")));
    EXPECT_FALSE(m_harness.Load(QStringLiteral("ctfx")));
    EXPECT_TRUE(m_events.isEmpty());
    EXPECT_TRUE(m_harness.Load(QStringLiteral("CTFX")));
    EXPECT_EQ(m_events, QStringList{QStringLiteral("load CTFX")});

    QList<QSharedPointer<_Framework>> frameworks{upper};
    EXPECT_EQ(m_harness.ListFrameworks(frameworks), 3u);
    EXPECT_EQ(frameworks.first()->name, QStringLiteral("CTFX"));
}

TEST_F(RunLoopTest, FailedLoadNamesTheHandsetKind)
{
    m_ctf->loads = false;
    EXPECT_FALSE(m_harness.Load(m_ctf));
    EXPECT_TRUE(m_log.Text().contains(
        QStringLiteral("Load Error: Kestix framework package for arm not found.\n")));
    EXPECT_FALSE(m_harness.Load(QSharedPointer<_Framework>()));
}

TEST_F(RunLoopTest, UnloadAllTakesEveryKitFramework)
{
    EXPECT_TRUE(m_harness.Unload());
    EXPECT_EQ(m_events, (QStringList{"unload ctf", "unload oat"}));
    EXPECT_FALSE(m_harness.Unload(QSharedPointer<_Framework>()));
}

TEST_F(RunLoopTest, SecondaryModulesComeFromBothCataloguesBeforeTheModuleStarts)
{
    QSharedPointer<Manifest> platform = MakeCatalogue(m_dir.filePath(QStringLiteral("platform")), true, {});
    HarnessControllerAccess::SetCatalogues(m_harness, m_kit, platform);
    QSharedPointer<RecordingModule> module(new RecordingModule(QStringLiteral("Main"), QStringLiteral("ctf"), &m_events));
    module->secondaryModules = {QStringLiteral("Both"), QStringLiteral("Nowhere")};
    for (Manifest *catalogue : {m_kit.data(), platform.data()}) {
        QSharedPointer<RecordingModule> both(
            new RecordingModule(QStringLiteral("Both"), QStringLiteral("secondary"), &m_events));
        catalogue->testModules.insert(QStringLiteral("both"), both);
    }

    EXPECT_TRUE(m_harness.Run(module));
    EXPECT_EQ(m_events, QStringList{QStringLiteral("run Main")});
    EXPECT_TRUE(m_log.Text().contains(QStringLiteral(
        "Loading Secondary Modules\n   Loading Secondary Module from KVK: Both\n"
        "   Loading Secondary Module from PVS: Both\n   Warning: Secondary Module Nowhere not found.\n")));
    EXPECT_FALSE(m_harness.Run(QSharedPointer<_TestModule>()));
}

TEST_F(RunLoopTest, RunByNameTakesTheKitModule)
{
    Queue(QStringLiteral("Named"), QStringLiteral("ctf"));
    EXPECT_TRUE(m_harness.Run(QStringLiteral("NAMED")));
    EXPECT_FALSE(m_harness.Run(QStringLiteral("unknown")));
    EXPECT_EQ(m_events, QStringList{QStringLiteral("run Named")});
}

} // namespace

namespace {

class ListingModule : public controllertest::ScriptedModule
{
public:
    ListingModule() : ScriptedModule(QStringLiteral("Lister")) {}
    bool GetLogFilePaths(IKestoDevice *device, QStringList &paths) override
    {
        if (!device)
            return false;
        paths << QStringLiteral("fs:/a.log") << QStringLiteral("fs:/b.log");
        return true;
    }
};

TEST_F(RunLoopTest, LogFilePathsComeFromTheModuleOnceConnected)
{
    QSharedPointer<_TestModule> module(new ListingModule);
    QStringList paths{QStringLiteral("stale")};
    EXPECT_EQ(m_harness.GetLogFilePaths(module, paths), 2u);
    EXPECT_EQ(paths, (QStringList{QStringLiteral("fs:/a.log"), QStringLiteral("fs:/b.log")}));

    m_harness.SetTarget(QStringLiteral("absent"));
    EXPECT_EQ(m_harness.GetLogFilePaths(module, paths), 0u);
    EXPECT_TRUE(paths.isEmpty());
    EXPECT_FALSE(m_harness.Unload(m_ctf));
    EXPECT_FALSE(m_harness.Load(m_ctf));
    EXPECT_TRUE(m_log.Text().contains(QStringLiteral("Load Error: A device is not available.\n")));
}

// Hands out modules in the order given and records how each ended.
class RecordingSource : public ModuleSource
{
public:
    RecordingSource(const QList<QSharedPointer<_TestModule>> &modules, bool keep)
        : m_modules(modules), m_keep(keep)
    {
    }
    QSharedPointer<_TestModule> Next() override
    {
        return m_modules.isEmpty() ? QSharedPointer<_TestModule>() : m_modules.takeFirst();
    }
    void Finished(const QSharedPointer<_TestModule> &module, Outcome outcome) override
    {
        outcomes.append(module->moduleName + QLatin1Char(' ') + QString::number(int(outcome)));
    }
    bool KeepFrameworks() const override { return m_keep; }

    QStringList outcomes;

private:
    QList<QSharedPointer<_TestModule>> m_modules;
    bool m_keep;
};

TEST_F(RunLoopTest, SourceRunKeepsFrameworksUntilTheEndWhenAsked)
{
    const QList<QSharedPointer<_TestModule>> modules{Queue(QStringLiteral("A"), QStringLiteral("ctf")),
                                                     Queue(QStringLiteral("B"), QStringLiteral("oat")),
                                                     Queue(QStringLiteral("C"), QStringLiteral("ctf")),
                                                     Queue(QStringLiteral("D"), QStringLiteral("uitf"))};
    RecordingSource keeping(modules, true);
    EXPECT_TRUE(m_harness.Run(keeping));
    EXPECT_EQ(m_events.filter(QRegularExpression(QStringLiteral("^(load|unload|run) "))),
              (QStringList{"load ctf", "run A", "load oat", "run B", "run C", "unload ctf", "unload oat"}));
    EXPECT_EQ(keeping.outcomes,
              (QStringList{QStringLiteral("A %1").arg(ModuleSource::Recorded),
                           QStringLiteral("B %1").arg(ModuleSource::Recorded),
                           QStringLiteral("C %1").arg(ModuleSource::Recorded),
                           QStringLiteral("D %1").arg(ModuleSource::NoFramework)}));

    // Without keeping, a framework goes as soon as another test type comes.
    m_events.clear();
    RecordingSource switching(modules.mid(0, 3), false);
    EXPECT_TRUE(m_harness.Run(switching));
    EXPECT_EQ(m_events.filter(QRegularExpression(QStringLiteral("^(load|unload|run) "))),
              (QStringList{"load ctf", "run A", "unload ctf", "load oat", "run B", "unload oat", "load ctf",
                           "run C", "unload ctf"}));
}

TEST_F(RunLoopTest, SourceIsToldWhichModuleTheLostHandsetInterrupted)
{
    QSharedPointer<RecordingModule> first = Queue(QStringLiteral("A"), QStringLiteral("ctf"));
    LoseHandsetWhilePolling(*first);
    RecordingSource source({first, Queue(QStringLiteral("B"), QStringLiteral("ctf"))}, true);
    EXPECT_FALSE(m_harness.Run(source));
    EXPECT_EQ(source.outcomes, QStringList{QStringLiteral("A %1").arg(ModuleSource::Interrupted)});
}

} // namespace
