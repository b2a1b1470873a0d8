// Faults met during whole runs on the emulated handset: the handset dropping out at every step of a module's run, logs
// that never end or are huge, packages whose module information is damaged, and host files (processed results,
// catalogue cache) that cannot be written.
//
// In every case the run must end (quickly, with the instant clock), report
// what happened, and keep every verdict recorded before.

#include "controller/harness.h"
#include "environment/testdirectories.h"
#include "support/kitrun.h"

#include <QDir>
#include <QDirIterator>
#include <QSettings>

#include <gtest/gtest.h>

#include <set>

using namespace Qt::StringLiterals;

namespace {

using testutil::ReadFile;
using testutil::ReadResults;
using testutil::WriteFile;

// A CTF module whose behaviour writes the shared CTF log with the first case
// passed and the second failed, ended by the end marker unless told otherwise.
kitbuilder::Module CtfModule(const QString &name, unsigned int classId, const QStringList &cases, bool ends = true)
{
    kitbuilder::Module module;
    module.kind = u"ctf"_s;
    module.name = name;
    module.family = u"faults"_s;
    module.testCases = cases;
    module.variants = {u"Win32_Debug"_s};
    module.package.directory = name;
    module.package.classIds = {classId};
    module.package.programs = {{name + u"_k"_s, QString()}};
    module.package.behaviour
        = u"mkdir -p usermods/CTF\n"
          "printf 'Suite: %1\\nTest: %2\\nResult: Pass\\nTest: %3\\nResult: Fail\\n%4' "
          "> usermods/CTF/CTF.log\n"_s.arg(name, cases.value(0), cases.value(1), ends ? u"[/VERBOSE]\\n"_s : QString())
              .toUtf8();
    return module;
}

class HandsetFaultTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        run.Kit().AddFrameworkPackage(u"testframeworks"_s, u"ctf"_s, u"Win32"_s, u"Debug"_s);
        AddModule(CtfModule(u"Audio"_s, 0x01230001, {u"play"_s, u"record"_s}));
        AddModule(CtfModule(u"Video"_s, 0x01230002, {u"show"_s, u"seek"_s}));
        ASSERT_TRUE(run.KitOk());
        run.AddHandset(u"phone"_s);
    }

    void AddModule(const kitbuilder::Module &module)
    {
        run.Kit().AddSourceModule(u"tests/"_s + module.name.toLower(), module);
    }

    bool RunModules(const QStringList &names, Log *log = nullptr)
    {
        Harness harness;
        run.Configure(harness, u"phone"_s, log ? log : run.log());
        return run.RunModules(harness, names);
    }

    QMap<QString, QString> Verdicts() const { return ReadResults(run.ResultsPath(u"phone"_s)).verdicts; }
    QString InHandset(const QString &relative) const { return run.HandsetFolder(u"phone"_s) + u'/' + relative; }

    testutil::KitRun run;
};

const QMap<QString, QString> kAllRecorded{{u"Audio/play"_s, u"pass"_s},
                                          {u"Audio/record"_s, u"fail"_s},
                                          {u"Video/show"_s, u"pass"_s},
                                          {u"Video/seek"_s, u"fail"_s}};

// The step of a module's run at which the handset was lost, told from the messages of one run; empty when it was not
// lost. Each step's message follows those of the steps before it.
QString LostAt(const QString &log)
{
    const QPair<QString, QString> steps[] = {
        {u"Unloading Framework"_s, u"unload"_s},
        {u"Removing test"_s, u"remove"_s},
        {u"No logs found"_s, u"copy"_s},
        {u"Test Video Run"_s, u"log wait"_s},
        {u"CtfTestModule::Run error"_s, u"start"_s},
        {u"Test Video Failed"_s, u"install"_s}, // the framework's or the module's
    };
    if (!log.contains(u"Device Connection has died."_s))
        return QString();
    for (const auto &[message, step] : steps) {
        if (log.contains(message))
            return step;
    }
    return u"unknown"_s;
}

TEST_F(HandsetFaultTest, HandsetLostAtAnyStepEndsTheRunAndKeepsRecordedVerdicts)
{
    ASSERT_TRUE(RunModules({u"Audio"_s, u"Video"_s}));
    ASSERT_EQ(Verdicts(), kAllRecorded) << run.LogText().toStdString();

    // The handset answers n operations of the next run and then drops out;
    // n grows until a whole run of Video gets through.
    std::set<QString> steps;
    bool completed = false;
    for (int answered = 0; answered < 400 && !completed; ++answered) {
        SCOPED_TRACE(answered);
        // Plugged in again with nothing installed.
        QFile::remove(InHandset(u"offline"_s));
        ASSERT_TRUE(QDir(InHandset(u"fs"_s)).removeRecursively() && QDir().mkpath(InHandset(u"fs"_s)));
        QSettings(InHandset(u"handset.ini"_s), QSettings::IniFormat).setValue(u"offlineAfter"_s, answered);
        testutil::CapturedLog log;
        const bool result = RunModules({u"Video"_s}, log.log());
        completed = !QFileInfo::exists(InHandset(u"offline"_s));
        // Wherever it was lost, the run says so and fails; the results file stays whole and no verdict is lost.
        EXPECT_EQ(result, completed) << log.Text().toStdString();
        if (!completed)
            steps.insert(LostAt(log.Text()));
        EXPECT_EQ(Verdicts(), kAllRecorded);
    }
    EXPECT_TRUE(completed);
    EXPECT_EQ(steps, (std::set<QString>{u"install"_s, u"start"_s, u"log wait"_s, u"copy"_s, u"remove"_s, u"unload"_s}));
}

TEST_F(HandsetFaultTest, NeverEndingLogIsTakenAfterTheBoundedWaitWithWhatItHolds)
{
    AddModule(CtfModule(u"Endless"_s, 0x01230003, {u"first"_s, u"second"_s}, false));
    ASSERT_TRUE(run.KitOk());
    ASSERT_TRUE(RunModules({u"Endless"_s, u"Audio"_s}));
    EXPECT_TRUE(run.LogText().contains(u"   Removing test Endless\n"_s)) << run.LogText().toStdString();
    const QMap<QString, QString> verdicts = Verdicts();
    EXPECT_EQ(verdicts.value(u"Endless/first"_s), u"pass"_s);
    EXPECT_EQ(verdicts.value(u"Endless/second"_s), u"fail"_s);
    EXPECT_EQ(verdicts.value(u"Audio/play"_s), u"pass"_s);
}

TEST_F(HandsetFaultTest, HugeLogIsCopiedParsedAndRecorded)
{
    kitbuilder::Module chatty = CtfModule(u"Chatty"_s, 0x01230004, {u"early"_s, u"late"_s});
    // About 24 MB: a verdict, half a million lines of chatter, one line of 4
    // MB without a break, then the last verdict and the end marker.
    chatty.package.behaviour = "mkdir -p usermods/CTF\n"
                               "{ printf 'Suite: Chatty\\nTest: early\\nResult: Pass\\n'\n"
                               "  yes 'chatter from a test that tells everything it does' | head -n 400000\n"
                               "  head -c 4000000 /dev/zero | tr '\\0' 'x'\n"
                               "  printf '\\nTest: late\\nResult: Fail\\n[/VERBOSE]\\n'\n"
                               "} > usermods/CTF/CTF.log\n";
    AddModule(chatty);
    ASSERT_TRUE(run.KitOk());
    ASSERT_TRUE(RunModules({u"Chatty"_s})) << run.LogText().toStdString();
    EXPECT_EQ(Verdicts().value(u"Chatty/early"_s), u"pass"_s);
    EXPECT_EQ(Verdicts().value(u"Chatty/late"_s), u"fail"_s);
    // The copy on the host is whole (and stamped).
    QDirIterator logs(run.LogFolder(u"phone"_s), {u"*.log"_s}, QDir::Files);
    ASSERT_TRUE(logs.hasNext());
    EXPECT_GT(QFileInfo(logs.next()).size(), 24'000'000);
}

TEST_F(HandsetFaultTest, ModuleWithDamagedInformationFileFailsToStartAndTheRunGoesOn)
{
    // Packages holding a truncated module information file, or bytes that are none at all, in place of their own.
    unsigned int classId = 0x01230005;
    for (const QString &name : {u"Truncated"_s, u"Garbage"_s}) {
        const kitbuilder::Module broken = CtfModule(name, classId++, {u"a"_s, u"b"_s});
        AddModule(broken);
        const QByteArray mif = testutil::BuildMif(broken.package);
        testutil::Members members = testutil::ModuleMembers(broken.package);
        for (auto &member : members) {
            if (member.first.endsWith(u".mif"_s))
                member.second
                    = name == u"Garbage"_s ? QByteArray("not a module information file") : mif.left(mif.size() / 2);
        }
        run.Kit().AddPackage(u"tests/"_s + name.toLower() + u"/package"_s, name + u"_Win32_Debug"_s, members);
    }
    ASSERT_TRUE(run.KitOk());

    ASSERT_TRUE(RunModules({u"Truncated"_s, u"Garbage"_s, u"Audio"_s}));
    const QString log = run.LogText();
    EXPECT_TRUE(log.contains(u"Test Truncated Failed\n"_s)) << log.toStdString();
    EXPECT_TRUE(log.contains(u"Test Garbage Failed\n"_s));
    EXPECT_FALSE(log.contains(u"Device Connection has died."_s));
    const QMap<QString, QString> verdicts = Verdicts();
    EXPECT_EQ(verdicts.value(u"Truncated/a"_s), u"unexecuted"_s);
    EXPECT_EQ(verdicts.value(u"Garbage/a"_s), u"unexecuted"_s);
    EXPECT_EQ(verdicts.value(u"Audio/play"_s), u"pass"_s);
}

TEST_F(HandsetFaultTest, UnwritableResultsFileIsReportedAndTheLogsStayForReprocessing)
{
    // The results folder cannot be made: a regular file stands in its place
    // (permissions would not stop a test that runs as root).
    const QString folder = QFileInfo(run.ResultsPath(u"phone"_s)).absolutePath();
    ASSERT_TRUE(QDir(folder).removeRecursively());
    WriteFile(folder, "a file where the folder should be");
    EXPECT_TRUE(RunModules({u"Audio"_s, u"Video"_s}));
    const QString log = run.LogText();
    EXPECT_TRUE(log.contains(u"could not be written"_s)) << log.toStdString();
    EXPECT_TRUE(log.contains(u"   Removing test Video\n"_s));
    EXPECT_EQ(ReadFile(folder), QByteArray("a file where the folder should be"));

    // The copied logs still hold every verdict: reprocessing records them.
    ASSERT_TRUE(QFile::remove(folder));
    ASSERT_TRUE(run.NewHarness(u"phone"_s).Process(0));
    EXPECT_EQ(ReadResults(run.LogFolder(u"phone"_s) + u"/ProcessedResults/ProcessedResults.xml"_s).verdicts,
              kAllRecorded);
}

TEST_F(HandsetFaultTest, UnwritableCatalogueCacheStillRunsTheKit)
{
    // The folder of every catalogue cache is a regular file.
    const QString caches = QFileInfo(TestDirectories::GetManifestDirectory(u"#1"_s)).absolutePath();
    ASSERT_TRUE(QDir(caches).removeRecursively());
    WriteFile(caches, "not a folder");
    EXPECT_TRUE(RunModules({u"Audio"_s})) << run.LogText().toStdString();
    EXPECT_EQ(Verdicts().value(u"Audio/play"_s), u"pass"_s);
    EXPECT_EQ(ReadFile(caches), QByteArray("not a folder"));
}

} // namespace
