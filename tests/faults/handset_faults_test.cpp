// Faults met during whole runs on the emulated handset: the handset dropping
// out at every step of a module's run, logs that never end or are huge,
// packages whose module information is damaged, and host files (processed
// results, catalogue cache) that cannot be written or were cut off.
//
// In every case the run must end (quickly, with the instant clock), report
// what happened, and keep every verdict recorded before.

#include "controller/controllertest.h"

#include "common/clock.h"
#include "environment/testdirectories.h"
#include "support/handsetfixture.h"
#include "support/kitbuilder.h"

#include <QDir>
#include <QDirIterator>
#include <QSettings>

#include <memory>
#include <set>

namespace {

using controllertest::ReadResults;
using controllertest::ResultsView;
using harnesstest::CapturedLog;
using testutil::EnvGuard;
using testutil::ReadFile;
using testutil::WriteFile;

// A CTF module's behaviour: the shared CTF log with two verdicts, ended by
// the end marker unless told otherwise.
QByteArray CtfBehaviour(const QString &suite, const QString &passing, const QString &failing,
                        bool ends = true)
{
    return QStringLiteral("mkdir -p usermods/CTF\n"
                          "printf 'Suite: %1\\nTest: %2\\nResult: Pass\\nTest: %3\\nResult: Fail\\n%4' "
                          "> usermods/CTF/CTF.log\n")
        .arg(suite, passing, failing, ends ? QStringLiteral("[/VERBOSE]\\n") : QString())
        .toUtf8();
}

kitbuilder::Module CtfModule(const QString &name, unsigned int classId, const QStringList &cases)
{
    kitbuilder::Module module;
    module.kind = QStringLiteral("ctf");
    module.name = name;
    module.family = QStringLiteral("faults");
    module.testCases = cases;
    module.variants = {QStringLiteral("Win32_Debug")};
    module.package.directory = name;
    module.package.classIds = {classId};
    module.package.programs = {{name + QStringLiteral("_k"), QString()}};
    module.package.behaviour = CtfBehaviour(name, cases.value(0), cases.value(1));
    return module;
}

class HandsetFaultTest : public ::testing::Test
{
protected:
    HandsetFaultTest()
        : m_env("KESTIX_DATA_ROOT", m_dir.filePath(QStringLiteral("data"))),
          m_kit(m_dir.filePath(QStringLiteral("kit")))
    {
    }

    void SetUp() override
    {
        ASSERT_TRUE(m_dir.isValid());
        m_kit.AddFrameworkPackage(QStringLiteral("testframeworks"), QStringLiteral("ctf"), QStringLiteral("Win32"),
                                  QStringLiteral("Debug"));
        AddModule(CtfModule(QStringLiteral("Audio"), 0x01230001, {QStringLiteral("play"), QStringLiteral("record")}));
        AddModule(CtfModule(QStringLiteral("Video"), 0x01230002, {QStringLiteral("show"), QStringLiteral("seek")}));
        ASSERT_TRUE(m_kit.Ok()) << m_kit.Errors().join(QLatin1Char('\n')).toStdString();
        m_handsets.AddHandset(QStringLiteral("phone"), QStringLiteral("Emulated phone"), QStringLiteral("win32"));
    }

    void AddModule(const kitbuilder::Module &module)
    {
        m_kit.AddSourceModule(QStringLiteral("tests/") + module.name.toLower(), module);
    }

    // A harness set up for the kit and the handset; logs go to LogFolder().
    std::unique_ptr<Harness> MakeHarness()
    {
        auto harness = std::make_unique<Harness>();
        harness->SetLogger(m_log.log());
        harness->SetTestkit(m_kit.Root());
        harness->SetTarget(QStringLiteral("phone"));
        harness->SetLogOutputPath(LogFolder());
        return harness;
    }

    // Queues the kit modules of those names and runs them.
    bool RunModules(Harness &harness, const QStringList &names)
    {
        for (const QString &name : names) {
            QList<QSharedPointer<_TestModule>> found;
            harness.GetTestModules(found, QStringList{name}, QString(), QString());
            EXPECT_EQ(found.size(), 1) << name.toStdString();
            for (const QSharedPointer<_TestModule> &module : found)
                harness.AddTest(module);
        }
        const bool result = harness.Run();
        harness.DisconnectTarget();
        return result;
    }

    QString LogFolder() const { return m_dir.filePath(QStringLiteral("logs")); }
    QString ResultsPath() const { return TestDirectories::GetProcessResultsPath(QStringLiteral("phone")); }
    QString HandsetFolder() const { return m_handsets.HandsetFolder(QStringLiteral("phone")); }

    void SetHandsetKey(const QString &key, const QVariant &value)
    {
        QSettings settings(HandsetFolder() + QStringLiteral("/handset.ini"), QSettings::IniFormat);
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
        QFile::remove(HandsetFolder() + QStringLiteral("/offline"));
        ASSERT_TRUE(QDir(HandsetFolder() + QStringLiteral("/fs")).removeRecursively());
        ASSERT_TRUE(QDir().mkpath(HandsetFolder() + QStringLiteral("/fs")));
    }

    QTemporaryDir m_dir;
    EnvGuard m_env;
    kitbuilder::KitBuilder m_kit;
    testutil::HandsetFixture m_handsets;
    CapturedLog m_log;
};

const QMap<QString, QString> kAllRecorded{
    {QStringLiteral("Audio/play"), QStringLiteral("pass")},
    {QStringLiteral("Audio/record"), QStringLiteral("fail")},
    {QStringLiteral("Video/show"), QStringLiteral("pass")},
    {QStringLiteral("Video/seek"), QStringLiteral("fail")}};

// The step of a module's run at which the handset was lost, told from the
// messages of one run; empty when it was not lost.
QString LostAt(const QString &log)
{
    if (!log.contains(QStringLiteral("Device Connection has died.")))
        return QString();
    if (log.contains(QStringLiteral("Unloading Framework")))
        return QStringLiteral("unload");
    if (log.contains(QStringLiteral("Removing test")))
        return QStringLiteral("remove");
    if (log.contains(QStringLiteral("No logs found")))
        return QStringLiteral("copy");
    if (log.contains(QStringLiteral("Test Video Run")))
        return QStringLiteral("log wait");
    if (log.contains(QStringLiteral("CtfTestModule::Run error")))
        return QStringLiteral("start");
    if (log.contains(QStringLiteral("Test Video Failed")))
        return QStringLiteral("install"); // the framework's or the module's
    return QStringLiteral("unknown");
}

TEST_F(HandsetFaultTest, HandsetLostAtAnyStepEndsTheRunAndKeepsRecordedVerdicts)
{
    {
        auto harness = MakeHarness();
        ASSERT_TRUE(RunModules(*harness, {QStringLiteral("Audio"), QStringLiteral("Video")}));
    }
    ASSERT_EQ(ReadResults(ResultsPath()).verdicts, kAllRecorded) << m_log.Text().toStdString();

    // The handset answers n operations of the next run and then drops out;
    // n grows until a whole run of Video gets through.
    std::set<QString> steps;
    bool completed = false;
    for (int answered = 0; answered < 400 && !completed; ++answered) {
        SCOPED_TRACE(answered);
        ResetHandset();
        SetHandsetKey(QStringLiteral("offlineAfter"), answered);
        CapturedLog log;
        auto harness = MakeHarness();
        harness->SetLogger(log.log());
        const bool result = RunModules(*harness, {QStringLiteral("Video")});
        const QString text = log.Text();
        const bool lost = QFileInfo::exists(HandsetFolder() + QStringLiteral("/offline"));
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
    SetHandsetKey(QStringLiteral("offlineAfter"), QVariant());
    EXPECT_EQ(steps, (std::set<QString>{QStringLiteral("install"), QStringLiteral("start"),
                                        QStringLiteral("log wait"), QStringLiteral("copy"),
                                        QStringLiteral("remove"), QStringLiteral("unload")}));
}

TEST_F(HandsetFaultTest, HandsetCountsOperationsBeforeDroppingOut)
{
    SetHandsetKey(QStringLiteral("offlineAfter"), 2);
    auto device = m_handsets.Connect(QStringLiteral("phone"));
    ASSERT_TRUE(device);
    QString version;
    EXPECT_EQ(device->GetPlatformVersion(version), 0u);
    EXPECT_FALSE(device->FileExists(QStringLiteral("fs:/nothing")));
    EXPECT_FALSE(device->connectionLost);
    EXPECT_NE(device->GetPlatformVersion(version), 0u);
    EXPECT_TRUE(device->connectionLost);
    EXPECT_TRUE(QFileInfo::exists(HandsetFolder() + QStringLiteral("/offline")));
    // Later connections find it unplugged.
    EXPECT_FALSE(m_handsets.Connect(QStringLiteral("phone")));
}

class NeverEndingLogTest : public HandsetFaultTest
{
protected:
    void SetUp() override
    {
        HandsetFaultTest::SetUp();
        kitbuilder::Module endless = CtfModule(QStringLiteral("Endless"), 0x01230003,
                                               {QStringLiteral("first"), QStringLiteral("second")});
        endless.package.behaviour = CtfBehaviour(QStringLiteral("Endless"), QStringLiteral("first"),
                                                 QStringLiteral("second"), false);
        AddModule(endless);
        ASSERT_TRUE(m_kit.Ok());
    }
};

TEST_F(NeverEndingLogTest, RunMovesOnAfterTheBoundedWaitWithWhatTheLogHolds)
{
    auto harness = MakeHarness();
    Clock::Timer timer;
    ASSERT_TRUE(RunModules(*harness, {QStringLiteral("Endless"), QStringLiteral("Audio")}));
    RecordProperty("wall_ms", int(timer.Elapsed()));
    const QString log = m_log.Text();
    EXPECT_TRUE(log.contains(QStringLiteral("   Removing test Endless\n"))) << log.toStdString();
    const ResultsView view = ReadResults(ResultsPath());
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Endless/first")), QStringLiteral("pass"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Endless/second")), QStringLiteral("fail"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/play")), QStringLiteral("pass"));
}

class HugeLogTest : public HandsetFaultTest
{
protected:
    void SetUp() override
    {
        HandsetFaultTest::SetUp();
        kitbuilder::Module chatty = CtfModule(QStringLiteral("Chatty"), 0x01230004,
                                              {QStringLiteral("early"), QStringLiteral("late")});
        // About 24 MB: a verdict, half a million lines of chatter, one line
        // of 4 MB without a break, then the last verdict and the end marker.
        chatty.package.behaviour =
            "mkdir -p usermods/CTF\n"
            "{ printf 'Suite: Chatty\\nTest: early\\nResult: Pass\\n'\n"
            "  yes 'chatter from a test that tells everything it does' | head -n 400000\n"
            "  head -c 4000000 /dev/zero | tr '\\0' 'x'\n"
            "  printf '\\nTest: late\\nResult: Fail\\n[/VERBOSE]\\n'\n"
            "} > usermods/CTF/CTF.log\n";
        AddModule(chatty);
        ASSERT_TRUE(m_kit.Ok());
    }
};

TEST_F(HugeLogTest, HugeLogIsCopiedParsedAndRecorded)
{
    auto harness = MakeHarness();
    ASSERT_TRUE(RunModules(*harness, {QStringLiteral("Chatty")})) << m_log.Text().toStdString();
    const ResultsView view = ReadResults(ResultsPath());
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Chatty/early")), QStringLiteral("pass"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Chatty/late")), QStringLiteral("fail"));
    // The copy on the host is whole (and stamped).
    QDirIterator logs(LogFolder(), {QStringLiteral("*.log")}, QDir::Files);
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
    kitbuilder::Module broken = CtfModule(QStringLiteral("Broken"), 0x01230005,
                                          {QStringLiteral("a"), QStringLiteral("b")});
    QByteArray mif = testutil::BuildMif(broken.package);
    mif = GetParam() == 0 ? mif.left(mif.size() / 2) : QByteArray("not a module information file");
    const QString folder = QStringLiteral("tests/broken");
    AddModule(broken);
    // The package, written again with the damaged file in place.
    testutil::Members members = testutil::ModuleMembers(broken.package);
    for (auto &member : members) {
        if (member.first.endsWith(QLatin1String(".mif")))
            member.second = mif;
    }
    m_kit.AddPackage(folder + QStringLiteral("/package"), QStringLiteral("Broken_Win32_Debug"), members);
    ASSERT_TRUE(m_kit.Ok());

    auto harness = MakeHarness();
    ASSERT_TRUE(RunModules(*harness, {QStringLiteral("Broken"), QStringLiteral("Audio")}));
    const QString log = m_log.Text();
    EXPECT_TRUE(log.contains(QStringLiteral("Test Broken Failed\n"))) << log.toStdString();
    EXPECT_FALSE(log.contains(QStringLiteral("Device Connection has died.")));
    const ResultsView view = ReadResults(ResultsPath());
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Broken/a")), QStringLiteral("unexecuted"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/play")), QStringLiteral("pass"));
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
    {
        auto harness = MakeHarness();
        EXPECT_TRUE(RunModules(*harness, {QStringLiteral("Audio"), QStringLiteral("Video")}));
    }
    const QString log = m_log.Text();
    EXPECT_TRUE(log.contains(QStringLiteral("could not be written"))) << log.toStdString();
    EXPECT_TRUE(log.contains(QStringLiteral("   Removing test Video\n")));
    EXPECT_EQ(ReadFile(folder), QByteArray("a file where the folder should be"));

    // The copied logs still hold every verdict: reprocessing records them.
    ASSERT_TRUE(QFile::remove(folder));
    auto harness = MakeHarness();
    ASSERT_TRUE(harness->Process(0));
    EXPECT_EQ(ReadResults(LogFolder() + QStringLiteral("/ProcessedResults/ProcessedResults.xml")).verdicts,
              kAllRecorded);
}

TEST_F(HandsetFaultTest, ResultsFileCutOffHalfWayIsKeptAsideAndRebuilt)
{
    {
        auto harness = MakeHarness();
        ASSERT_TRUE(RunModules(*harness, {QStringLiteral("Audio")}));
    }
    const QByteArray whole = ReadFile(ResultsPath());
    const QByteArray half = whole.left(whole.size() / 2);
    WriteFile(ResultsPath(), half);

    ResetHandset();
    auto harness = MakeHarness();
    ASSERT_TRUE(RunModules(*harness, {QStringLiteral("Video")}));
    const ResultsView view = ReadResults(ResultsPath());
    ASSERT_TRUE(view.ok);
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Video/show")), QStringLiteral("pass"));
    // The damaged file is kept byte for byte beside the new one.
    QDirIterator aside(QFileInfo(ResultsPath()).absolutePath(), {QStringLiteral("*.unreadable-*")}, QDir::Files);
    ASSERT_TRUE(aside.hasNext()) << m_log.Text().toStdString();
    EXPECT_EQ(ReadFile(aside.next()), half);
}

TEST_F(HandsetFaultTest, UnwritableCatalogueCacheStillRunsTheKit)
{
    // The folder of every catalogue cache is a regular file.
    const QString caches = QFileInfo(TestDirectories::GetManifestDirectory(QStringLiteral("#1"))).absolutePath();
    ASSERT_TRUE(QDir(caches).removeRecursively());
    WriteFile(caches, "not a folder");
    auto harness = MakeHarness();
    EXPECT_TRUE(RunModules(*harness, {QStringLiteral("Audio")})) << m_log.Text().toStdString();
    EXPECT_EQ(ReadResults(ResultsPath()).verdicts.value(QStringLiteral("Audio/play")), QStringLiteral("pass"));
    EXPECT_EQ(ReadFile(caches), QByteArray("not a folder"));
}

TEST_F(HandsetFaultTest, CatalogueCacheCutOffHalfWayIsScannedAgain)
{
    {
        auto harness = MakeHarness();
        ASSERT_TRUE(RunModules(*harness, {QStringLiteral("Audio")}));
    }
    const QString cache = Manifest(m_kit.Root(), false).ManifestFilePath();
    const QByteArray whole = ReadFile(cache);
    ASSERT_FALSE(whole.isEmpty());
    WriteFile(cache, whole.left(whole.size() / 2));

    ResetHandset();
    auto harness = MakeHarness();
    ASSERT_TRUE(RunModules(*harness, {QStringLiteral("Video")}));
    EXPECT_TRUE(m_log.Text().contains(QStringLiteral("Manifest out of date for ")));
    EXPECT_EQ(ReadFile(cache), whole);
    EXPECT_EQ(ReadResults(ResultsPath()).verdicts, kAllRecorded);
}

} // namespace
