#include "harnesstest.h"

#include "support/handsetfixture.h"

#include "environment/testdirectories.h"


namespace {

using harnesstest::CapturedLog;
using testutil::EnvGuard;
using testutil::ReadFile;
using testutil::WriteFile;

// Each test gets its own handsets folder and data root.
class HarnessTargetTest : public ::testing::Test
{
protected:
    HarnessTargetTest() : m_env("KESTIX_DATA_ROOT", m_handsets.WorkFolder() + QStringLiteral("/data")) {}
    void SetUp() override { m_harness.SetLogger(m_log.log()); }
    void TearDown() override { m_harness.DisconnectTarget(); }

    QString HandsetFolder(const QString &name) const { return m_handsets.HandsetFolder(name); }
    QString WorkPath(const QString &name) const
    {
        return m_handsets.WorkFolder() + QLatin1Char('/') + name;
    }
    void AddHandset(const QString &name, const QString &description,
                    const QString &version = QString(), bool offline = false)
    {
        m_handsets.AddHandset(name, description, QStringLiteral("arm"), version);
        if (offline)
            WriteFile(HandsetFolder(name) + QStringLiteral("/offline"), QByteArray());
    }
    QString Connected() const
    {
        const IKestoDevice *device = HarnessTestAccess::Device(m_harness);
        return device ? device->GetConnectTarget().name : QString();
    }
    const QMap<QString, QString> &Env() const { return HarnessTestAccess::Environment(m_harness); }

    testutil::HandsetFixture m_handsets;
    EnvGuard m_env;
    CapturedLog m_log;
    Harness m_harness;
};

struct MatchCase
{
    const char *request;
    const char *expected;
};

class HarnessTargetMatchTest : public HarnessTargetTest,
                               public ::testing::WithParamInterface<MatchCase>
{
};

TEST_P(HarnessTargetMatchTest, ConnectsToTheFirstTargetWhoseNameOrDescriptionContainsTheRequest)
{
    AddHandset(QStringLiteral("Alpha-1234"), QStringLiteral("Kesto Phone Red"));
    AddHandset(QStringLiteral("Beta-5678"), QStringLiteral("Kesto Phone Blue"));
    AddHandset(QStringLiteral("Gamma-9012"), QStringLiteral("Tablet"));

    ASSERT_TRUE(m_harness.ConnectToTarget(QString::fromLatin1(GetParam().request)));
    EXPECT_EQ(Connected(), QLatin1String(GetParam().expected));
    EXPECT_EQ(m_log.Text(), QStringLiteral("Connected to target: %1").arg(Connected()));
}

INSTANTIATE_TEST_SUITE_P(Requests, HarnessTargetMatchTest,
                         ::testing::Values(MatchCase{"5678", "Beta-5678"},
                                           MatchCase{"bEtA", "Beta-5678"},
                                           MatchCase{"BLUE", "Beta-5678"},
                                           MatchCase{"phone", "Alpha-1234"},
                                           MatchCase{"tab", "Gamma-9012"},
                                           MatchCase{"", "Alpha-1234"}));

TEST_F(HarnessTargetTest, AnEmptyRequestUsesTheStoredTarget)
{
    AddHandset(QStringLiteral("Alpha-1234"), QStringLiteral("one"));
    AddHandset(QStringLiteral("Beta-5678"), QStringLiteral("two"));
    m_harness.SetTarget(QStringLiteral("TWO"));
    ASSERT_TRUE(m_harness.ConnectToTarget(QString()));
    EXPECT_EQ(Connected(), QStringLiteral("Beta-5678"));
}

TEST_F(HarnessTargetTest, AMatchThatDoesNotConnectGivesWayToTheNextMatch)
{
    AddHandset(QStringLiteral("Alpha-1234"), QStringLiteral("Kesto Phone"), QString(), true);
    AddHandset(QStringLiteral("Beta-5678"), QStringLiteral("Kesto Phone"));

    ASSERT_TRUE(m_harness.ConnectToTarget(QStringLiteral("kesto")));
    EXPECT_EQ(Connected(), QStringLiteral("Beta-5678"));
    const QString log = m_log.Text();
    EXPECT_TRUE(log.contains(QStringLiteral("Gateway could not connect to device Alpha-1234.")));
    EXPECT_TRUE(log.endsWith(QStringLiteral("Connected to target: Beta-5678")));

    // While connected every request is satisfied by the open connection.
    EXPECT_TRUE(m_harness.ConnectToTarget(QStringLiteral("no such handset")));
    EXPECT_EQ(Connected(), QStringLiteral("Beta-5678"));
}

TEST_F(HarnessTargetTest, NoMatchingHandsetNamesTheStoredTarget)
{
    m_harness.SetTarget(QStringLiteral("Delta"));
    EXPECT_FALSE(m_harness.IsTargetAvailable());
    EXPECT_FALSE(m_harness.ConnectToTarget(QStringLiteral("other")));
    EXPECT_TRUE(m_harness.GetDefaultLogFilePath().isEmpty());
    EXPECT_FALSE(m_harness.CopyFileFromDevice(QStringLiteral("fs:/a.txt"),
                                              WorkPath(QStringLiteral("a.txt"))));
    EXPECT_EQ(m_log.Text(), QStringLiteral("Target Delta not found.").repeated(3));

    AddHandset(QStringLiteral("Alpha-1234"), QStringLiteral("Phone"), QString(), true);
    EXPECT_TRUE(m_harness.IsTargetAvailable());
    EXPECT_FALSE(m_harness.ConnectToTarget(QStringLiteral("alpha")));
    EXPECT_TRUE(m_log.Text().endsWith(QStringLiteral("Target Delta not found.")));
    EXPECT_EQ(HarnessTestAccess::Device(m_harness), nullptr);
}

TEST_F(HarnessTargetTest, ConnectingFillsTheHandsetEntriesOfTheEnvironment)
{
    AddHandset(QStringLiteral("My Phone:1"), QStringLiteral("Phone"), QStringLiteral("Kesto 4.2"));
    AddHandset(QStringLiteral("Other"), QStringLiteral("Other"));

    EXPECT_EQ(m_harness.GetDefaultLogFilePath(), TestDirectories::GetLogDirectory(QStringLiteral("My Phone:1")));
    EXPECT_EQ(Env().value(QStringLiteral("LogPath")),
              TestDirectories::GetLogDirectory(QStringLiteral("My Phone:1")));
    EXPECT_EQ(Env().value(QStringLiteral("ProcessedResultsPath")),
              TestDirectories::GetProcessResultsPath(QStringLiteral("My Phone:1")));
    EXPECT_EQ(Env().value(QStringLiteral("KestoVersion")), QStringLiteral("Kesto 4.2"));

    // The defaults are set once; another handset later keeps them.
    m_harness.SetTarget(QStringLiteral("other"));
    EXPECT_TRUE(m_harness.ConnectToTarget(QString()));
    EXPECT_EQ(Connected(), QStringLiteral("Other"));
    EXPECT_EQ(Env().value(QStringLiteral("LogPath")),
              TestDirectories::GetLogDirectory(QStringLiteral("My Phone:1")));
    EXPECT_EQ(Env().value(QStringLiteral("KestoVersion")), QStringLiteral("Kesto 4.2"));
}

TEST_F(HarnessTargetTest, LogOutputPathSetBeforeConnectingIsKept)
{
    AddHandset(QStringLiteral("Alpha"), QStringLiteral("Phone"));
    const QString logs = WorkPath(QStringLiteral("my logs"));
    m_harness.SetLogOutputPath(logs);
    ASSERT_TRUE(m_harness.ConnectToTarget(QString()));
    EXPECT_EQ(Env().value(QStringLiteral("LogPath")), logs);
    EXPECT_TRUE(Env().contains(QStringLiteral("ProcessedResultsPath")));
    // A handset without a version text adds none.
    EXPECT_FALSE(Env().contains(QStringLiteral("KestoVersion")));
}

TEST_F(HarnessTargetTest, SetTargetKeepsTheConnectionForTheSameNameAndDropsItForANewOne)
{
    AddHandset(QStringLiteral("Alpha"), QStringLiteral("Phone"));
    AddHandset(QStringLiteral("Beta"), QStringLiteral("Phone"));
    WriteFile(HandsetFolder(QStringLiteral("Beta")) + QStringLiteral("/fs/logs/run.log"), "beta log");

    m_harness.SetTarget(QStringLiteral("alpha"));
    ASSERT_TRUE(m_harness.ConnectToTarget(QString()));
    const IKestoDevice *first = HarnessTestAccess::Device(m_harness);
    m_harness.SetTarget(QStringLiteral("alpha"));
    m_harness.SetTarget(QString());
    EXPECT_EQ(HarnessTestAccess::Device(m_harness), first);
    EXPECT_EQ(HarnessTestAccess::Target(m_harness), QStringLiteral("alpha"));

    m_harness.SetTarget(QStringLiteral("beta"));
    EXPECT_EQ(HarnessTestAccess::Device(m_harness), nullptr);
    // The next operation connects to the new handset.
    const QString host = WorkPath(QStringLiteral("copied.log"));
    EXPECT_TRUE(m_harness.CopyFileFromDevice(QStringLiteral("fs:/logs/run.log"), host));
    EXPECT_EQ(Connected(), QStringLiteral("Beta"));
    EXPECT_EQ(ReadFile(host), QByteArray("beta log"));
    EXPECT_FALSE(m_harness.CopyFileFromDevice(QStringLiteral("fs:/logs/missing.log"), host));
}

TEST_F(HarnessTargetTest, DisconnectAllowsConnectingElsewhere)
{
    AddHandset(QStringLiteral("Alpha"), QStringLiteral("Phone"));
    AddHandset(QStringLiteral("Beta"), QStringLiteral("Phone"));
    ASSERT_TRUE(m_harness.ConnectToTarget(QStringLiteral("alpha")));
    m_harness.DisconnectTarget();
    EXPECT_EQ(HarnessTestAccess::Device(m_harness), nullptr);
    m_harness.DisconnectTarget();
    ASSERT_TRUE(m_harness.ConnectToTarget(QStringLiteral("beta")));
    EXPECT_EQ(Connected(), QStringLiteral("Beta"));

    QList<ConnectTarget> targets{ConnectTarget(QStringLiteral("stale"), QString())};
    EXPECT_EQ(Harness::ListTargets(targets), 2u);
    EXPECT_EQ(targets.size(), 2);
    EXPECT_EQ(targets.first().name, QStringLiteral("Alpha"));
}

TEST(HarnessConfiguration, CopyDelayTakesUnsigned32BitDecimalsOnly)
{
    const QList<QPair<QString, quint32>> cases{
        {QStringLiteral("1500"), 1500u},     {QStringLiteral("abc"), 0u},
        {QStringLiteral("0x10"), 0u},        {QStringLiteral("-1"), 0u},
        {QString(), 0u},                     {QStringLiteral("4294967295"), 4294967295u},
        {QStringLiteral("4294967296"), 0u},  {QStringLiteral("12abc"), 0u}};
    Harness harness;
    for (const auto &[text, expected] : cases) {
        harness.SetCopyDelay(QStringLiteral("7"));
        harness.SetCopyDelay(text);
        EXPECT_EQ(HarnessTestAccess::CopyDelay(harness), expected) << text.toStdString();
    }
}

TEST(HarnessConfiguration, EmptyOrUnchangedKitAndPlatformChangeNothing)
{
    Harness harness;
    harness.SetTestkit(QStringLiteral("kit"));
    harness.SetPlatform(QStringLiteral("platform"));
    harness.SetTestkit(QString());
    harness.SetPlatform(QString());
    EXPECT_EQ(harness.GetTestkit(), QStringLiteral("kit"));
    EXPECT_EQ(harness.GetPlatform(), QStringLiteral("platform"));
}

} // namespace
