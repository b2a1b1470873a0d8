// Faults met during whole runs on the emulated handset: the handset dropping
// out at every step of a module's run, logs that never end or are huge,
// packages whose module information is damaged, and host files (processed
// results, catalogue cache) that cannot be written.
//
// In every case the run must end (quickly, with the instant clock), report
// what happened, and keep every verdict recorded before.

#include "common/clock.h"
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

using testutil::CapturedLog;
using testutil::ReadFile;
using testutil::ReadResults;
using testutil::ResultsView;
using testutil::WriteFile;

// A CTF module's behaviour: the shared CTF log with two verdicts, ended by
// the end marker unless told otherwise.
QByteArray CtfBehaviour(const QString &suite, const QString &passing, const QString &failing, bool ends = true)
{
    return u"mkdir -p usermods/CTF\n"
           "printf 'Suite: %1\\nTest: %2\\nResult: Pass\\nTest: %3\\nResult: Fail\\n%4' "
           "> usermods/CTF/CTF.log\n"_s.arg(suite, passing, failing, ends ? u"[/VERBOSE]\\n"_s : QString())
               .toUtf8();
}

kitbuilder::Module CtfModule(const QString &name, unsigned int classId, const QStringList &cases)
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
    module.package.behaviour = CtfBehaviour(name, cases.value(0), cases.value(1));
    return module;
}

class HandsetFaultTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        m_run.Kit().AddFrameworkPackage(u"testframeworks"_s, u"ctf"_s, u"Win32"_s, u"Debug"_s);
        AddModule(CtfModule(u"Audio"_s, 0x01230001, {u"play"_s, u"record"_s}));
        AddModule(CtfModule(u"Video"_s, 0x01230002, {u"show"_s, u"seek"_s}));
        ASSERT_TRUE(m_run.KitOk());
        m_run.AddHandset(u"phone"_s);
    }

    void AddModule(const kitbuilder::Module &module)
    {
        m_run.Kit().AddSourceModule(u"tests/"_s + module.name.toLower(), module);
    }

    bool RunModules(const QStringList &names, Log *log = nullptr)
    {
        Harness harness;
        m_run.Configure(harness, u"phone"_s, log ? log : m_run.log());
        return m_run.RunModules(harness, names);
    }

    QString LogFolder() const { return m_run.LogFolder(u"phone"_s); }
    QString ResultsPath() const { return m_run.ResultsPath(u"phone"_s); }
    QString HandsetFolder() const { return m_run.HandsetFolder(u"phone"_s); }

    void SetHandsetKey(const QString &key, const QVariant &value)
    {
        QSettings settings(HandsetFolder() + u"/handset.ini"_s, QSettings::IniFormat);
        if (value.isNull())
            settings.remove(key);
        else
            settings.setValue(key, value);
        settings.sync();
        ASSERT_EQ(settings.status(), QSettings::NoError);
    }

    // Plugs the handset in again with nothing installed.
    void ResetHandset()
    {
        QFile::remove(HandsetFolder() + u"/offline"_s);
        ASSERT_TRUE(QDir(HandsetFolder() + u"/fs"_s).removeRecursively());
        ASSERT_TRUE(QDir().mkpath(HandsetFolder() + u"/fs"_s));
    }

    testutil::KitRun m_run;
};

const QMap<QString, QString> kAllRecorded{{u"Audio/play"_s, u"pass"_s},
                                          {u"Audio/record"_s, u"fail"_s},
                                          {u"Video/show"_s, u"pass"_s},
                                          {u"Video/seek"_s, u"fail"_s}};

// The step of a module's run at which the handset was lost, told from the
// messages of one run; empty when it was not lost.
QString LostAt(const QString &log)
{
    if (!log.contains(u"Device Connection has died."_s))
        return QString();
    if (log.contains(u"Unloading Framework"_s))
        return u"unload"_s;
    if (log.contains(u"Removing test"_s))
        return u"remove"_s;
    if (log.contains(u"No logs found"_s))
        return u"copy"_s;
    if (log.contains(u"Test Video Run"_s))
        return u"log wait"_s;
    if (log.contains(u"CtfTestModule::Run error"_s))
        return u"start"_s;
    if (log.contains(u"Test Video Failed"_s))
        return u"install"_s; // the framework's or the module's
    return u"unknown"_s;
}

TEST_F(HandsetFaultTest, HandsetLostAtAnyStepEndsTheRunAndKeepsRecordedVerdicts)
{
    ASSERT_TRUE(RunModules({u"Audio"_s, u"Video"_s}));
    ASSERT_EQ(ReadResults(ResultsPath()).verdicts, kAllRecorded) << m_run.LogText().toStdString();

    // The handset answers n operations of the next run and then drops out;
    // n grows until a whole run of Video gets through.
    std::set<QString> steps;
    bool completed = false;
    for (int answered = 0; answered < 400 && !completed; ++answered) {
        SCOPED_TRACE(answered);
        ResetHandset();
        SetHandsetKey(u"offlineAfter"_s, answered);
        CapturedLog log;
        const bool result = RunModules({u"Video"_s}, log.log());
        const QString text = log.Text();
        const bool lost = QFileInfo::exists(HandsetFolder() + u"/offline"_s);
        completed = !lost;
        if (lost) {
            // Wherever it was lost, the run says so and fails.
            const QString step = LostAt(text);
            steps.insert(step);
            EXPECT_FALSE(result) << text.toStdString();
            EXPECT_NE(step, QString()) << text.toStdString();
        } else {
            EXPECT_TRUE(result) << text.toStdString();
        }
        // Whatever happened, the results file is whole and no verdict is lost.
        const ResultsView view = ReadResults(ResultsPath());
        ASSERT_TRUE(view.ok);
        EXPECT_EQ(view.verdicts, kAllRecorded);
    }
    EXPECT_TRUE(completed);
    SetHandsetKey(u"offlineAfter"_s, QVariant());
    EXPECT_EQ(steps, (std::set<QString>{u"install"_s, u"start"_s, u"log wait"_s, u"copy"_s, u"remove"_s, u"unload"_s}));
}

TEST_F(HandsetFaultTest, NeverEndingLogIsTakenAfterTheBoundedWaitWithWhatItHolds)
{
    kitbuilder::Module endless = CtfModule(u"Endless"_s, 0x01230003, {u"first"_s, u"second"_s});
    endless.package.behaviour = CtfBehaviour(u"Endless"_s, u"first"_s, u"second"_s, false);
    AddModule(endless);
    ASSERT_TRUE(m_run.KitOk());
    Clock::Timer timer;
    ASSERT_TRUE(RunModules({u"Endless"_s, u"Audio"_s}));
    RecordProperty("wall_ms", int(timer.Elapsed()));
    const QString log = m_run.LogText();
    EXPECT_TRUE(log.contains(u"   Removing test Endless\n"_s)) << log.toStdString();
    const ResultsView view = ReadResults(ResultsPath());
    EXPECT_EQ(view.verdicts.value(u"Endless/first"_s), u"pass"_s);
    EXPECT_EQ(view.verdicts.value(u"Endless/second"_s), u"fail"_s);
    EXPECT_EQ(view.verdicts.value(u"Audio/play"_s), u"pass"_s);
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
    ASSERT_TRUE(m_run.KitOk());
    ASSERT_TRUE(RunModules({u"Chatty"_s})) << m_run.LogText().toStdString();
    const ResultsView view = ReadResults(ResultsPath());
    EXPECT_EQ(view.verdicts.value(u"Chatty/early"_s), u"pass"_s);
    EXPECT_EQ(view.verdicts.value(u"Chatty/late"_s), u"fail"_s);
    // The copy on the host is whole (and stamped).
    QDirIterator logs(LogFolder(), {u"*.log"_s}, QDir::Files);
    ASSERT_TRUE(logs.hasNext());
    EXPECT_GT(QFileInfo(logs.next()).size(), 24'000'000);
}

// A module whose package holds a damaged module information file: a
// truncated one, or bytes that are none at all.
class CorruptMifTest : public HandsetFaultTest, public ::testing::WithParamInterface<int>
{
};

TEST_P(CorruptMifTest, ModuleFailsToStartAndTheRunGoesOn)
{
    kitbuilder::Module broken = CtfModule(u"Broken"_s, 0x01230005, {u"a"_s, u"b"_s});
    QByteArray mif = testutil::BuildMif(broken.package);
    mif = GetParam() == 0 ? mif.left(mif.size() / 2) : QByteArray("not a module information file");
    const QString folder = u"tests/broken"_s;
    AddModule(broken);
    // The package, written again with the damaged file in place.
    testutil::Members members = testutil::ModuleMembers(broken.package);
    for (auto &member : members) {
        if (member.first.endsWith(u".mif"_s))
            member.second = mif;
    }
    m_run.Kit().AddPackage(folder + u"/package"_s, u"Broken_Win32_Debug"_s, members);
    ASSERT_TRUE(m_run.KitOk());

    ASSERT_TRUE(RunModules({u"Broken"_s, u"Audio"_s}));
    const QString log = m_run.LogText();
    EXPECT_TRUE(log.contains(u"Test Broken Failed\n"_s)) << log.toStdString();
    EXPECT_FALSE(log.contains(u"Device Connection has died."_s));
    const ResultsView view = ReadResults(ResultsPath());
    EXPECT_EQ(view.verdicts.value(u"Broken/a"_s), u"unexecuted"_s);
    EXPECT_EQ(view.verdicts.value(u"Audio/play"_s), u"pass"_s);
}

INSTANTIATE_TEST_SUITE_P(Damage, CorruptMifTest, ::testing::Values(0, 1),
                         [](const ::testing::TestParamInfo<int> &info) {
                             return info.param == 0 ? std::string("Truncated") : std::string("Garbage");
                         });

TEST_F(HandsetFaultTest, UnwritableResultsFileIsReportedAndTheLogsStayForReprocessing)
{
    // The results folder cannot be made: a regular file stands in its place
    // (permissions would not stop a test that runs as root).
    const QString folder = QFileInfo(ResultsPath()).absolutePath();
    ASSERT_TRUE(QDir(folder).removeRecursively());
    WriteFile(folder, "a file where the folder should be");
    EXPECT_TRUE(RunModules({u"Audio"_s, u"Video"_s}));
    const QString log = m_run.LogText();
    EXPECT_TRUE(log.contains(u"could not be written"_s)) << log.toStdString();
    EXPECT_TRUE(log.contains(u"   Removing test Video\n"_s));
    EXPECT_EQ(ReadFile(folder), QByteArray("a file where the folder should be"));

    // The copied logs still hold every verdict: reprocessing records them.
    ASSERT_TRUE(QFile::remove(folder));
    ASSERT_TRUE(m_run.NewHarness(u"phone"_s).Process(0));
    EXPECT_EQ(ReadResults(LogFolder() + u"/ProcessedResults/ProcessedResults.xml"_s).verdicts, kAllRecorded);
}

TEST_F(HandsetFaultTest, UnwritableCatalogueCacheStillRunsTheKit)
{
    // The folder of every catalogue cache is a regular file.
    const QString caches = QFileInfo(TestDirectories::GetManifestDirectory(u"#1"_s)).absolutePath();
    ASSERT_TRUE(QDir(caches).removeRecursively());
    WriteFile(caches, "not a folder");
    EXPECT_TRUE(RunModules({u"Audio"_s})) << m_run.LogText().toStdString();
    EXPECT_EQ(ReadResults(ResultsPath()).verdicts.value(u"Audio/play"_s), u"pass"_s);
    EXPECT_EQ(ReadFile(caches), QByteArray("not a folder"));
}

} // namespace
