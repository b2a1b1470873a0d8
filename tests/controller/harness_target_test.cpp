#include "harnesstest.h"

#include "environment/testdirectories.h"

namespace {

// Each test gets its own handsets folder and data root.
class HarnessTargetTest : public ::testing::Test
{
protected:
    void SetUp() override { m_harness.SetLogger(m_log.log()); }
    void TearDown() override { m_harness.DisconnectTarget(); }

    QString HandsetFolder(const QString &name) const { return m_handsets.HandsetFolder(name); }
    QString WorkPath(const QString &name) const { return m_handsets.WorkFolder() + u'/' + name; }
    void AddHandset(const QString &name, const QString &description, const QString &version = QString())
    {
        m_handsets.AddHandset(name, description, u"arm"_s, version);
    }
    QString Connected() const
    {
        const IKestoDevice *device = HarnessTestAccess::Device(m_harness);
        return device ? device->GetConnectTarget().name : QString();
    }
    const QMap<QString, QString> &Env() { return HarnessTestAccess::Environment(m_harness); }

    KitRun m_run;
    HandsetFixture &m_handsets = m_run.Handsets();
    CapturedLog m_log;
    Harness m_harness;
};

TEST_F(HarnessTargetTest, ConnectsToTheFirstTargetWhoseNameOrDescriptionContainsTheRequestOrTheStoredTarget)
{
    AddHandset(u"Alpha-1234"_s, u"Kesto Phone Red"_s);
    AddHandset(u"Beta-5678"_s, u"Kesto Phone Blue"_s);
    AddHandset(u"Gamma-9012"_s, u"Tablet"_s);
    // Stored target, request, connected.
    const char *rows[][3]
        = {{"", "5678", "Beta-5678"}, {"", "bEtA", "Beta-5678"}, {"", "BLUE", "Beta-5678"}, {"", "phone", "Alpha-1234"},
           {"", "tab", "Gamma-9012"}, {"", "", "Alpha-1234"},    {"blue", "", "Beta-5678"}};
    for (const auto &row : rows) {
        SCOPED_TRACE(row[0] + std::string(" ") + row[1]);
        m_harness.SetTarget(QString::fromLatin1(row[0]));
        const qsizetype logged = m_log.Text().size();
        ASSERT_TRUE(m_harness.ConnectToTarget(QString::fromLatin1(row[1])));
        EXPECT_EQ(Connected(), QLatin1String(row[2]));
        EXPECT_EQ(m_log.Text().mid(logged), u"Connected to target: %1"_s.arg(Connected()));
        m_harness.DisconnectTarget();
    }
}

TEST_F(HarnessTargetTest, NoMatchingHandsetNamesTheStoredTargetAndAMatchThatDoesNotConnectGivesWayToTheNext)
{
    m_harness.SetTarget(u"Delta"_s);
    EXPECT_FALSE(m_harness.IsTargetAvailable());
    EXPECT_FALSE(m_harness.ConnectToTarget(u"other"_s));
    EXPECT_TRUE(m_harness.GetDefaultLogFilePath().isEmpty());
    EXPECT_FALSE(m_harness.CopyFileFromDevice(u"fs:/a.txt"_s, WorkPath(u"a.txt"_s)));
    EXPECT_EQ(m_log.Text(), u"Target Delta not found."_s.repeated(3));

    AddHandset(u"Alpha-1234"_s, u"Kesto Phone"_s);
    WriteFile(HandsetFolder(u"Alpha-1234"_s) + u"/offline"_s, QByteArray());
    EXPECT_TRUE(m_harness.IsTargetAvailable());
    EXPECT_FALSE(m_harness.ConnectToTarget(u"alpha"_s));
    EXPECT_TRUE(m_log.Text().endsWith(u"Target Delta not found."_s));
    EXPECT_EQ(HarnessTestAccess::Device(m_harness), nullptr);

    AddHandset(u"Beta-5678"_s, u"Kesto Phone"_s);
    ASSERT_TRUE(m_harness.ConnectToTarget(u"kesto"_s));
    EXPECT_EQ(Connected(), u"Beta-5678"_s);
    EXPECT_TRUE(m_log.Text().contains(u"Gateway could not connect to device Alpha-1234."_s));
    EXPECT_TRUE(m_log.Text().endsWith(u"Connected to target: Beta-5678"_s));
    // While connected every request is satisfied by the open connection.
    EXPECT_TRUE(m_harness.ConnectToTarget(u"no such handset"_s));
    EXPECT_EQ(Connected(), u"Beta-5678"_s);
}

TEST_F(HarnessTargetTest, ConnectingFillsTheHandsetEntriesOfTheEnvironmentOnce)
{
    AddHandset(u"My Phone:1"_s, u"Phone"_s, u"Kesto 4.2"_s);
    AddHandset(u"Other"_s, u"Other"_s);

    EXPECT_EQ(m_harness.GetDefaultLogFilePath(), TestDirectories::GetLogDirectory(u"My Phone:1"_s));
    EXPECT_EQ(Env().value(u"LogPath"_s), TestDirectories::GetLogDirectory(u"My Phone:1"_s));
    EXPECT_EQ(Env().value(u"ProcessedResultsPath"_s), TestDirectories::GetProcessResultsPath(u"My Phone:1"_s));
    EXPECT_EQ(Env().value(u"KestoVersion"_s), u"Kesto 4.2"_s);

    // The defaults are set once; another handset later keeps them.
    m_harness.SetTarget(u"other"_s);
    EXPECT_TRUE(m_harness.ConnectToTarget(QString()));
    EXPECT_EQ(Connected(), u"Other"_s);
    EXPECT_EQ(Env().value(u"LogPath"_s), TestDirectories::GetLogDirectory(u"My Phone:1"_s));
    EXPECT_EQ(Env().value(u"KestoVersion"_s), u"Kesto 4.2"_s);

    // A log folder set beforehand is kept, and a handset without a version text adds none.
    Harness preset;
    const QString logs = WorkPath(u"my logs"_s);
    preset.SetLogOutputPath(logs);
    preset.SetTarget(u"other"_s);
    ASSERT_TRUE(preset.ConnectToTarget(QString()));
    EXPECT_EQ(HarnessTestAccess::Environment(preset).value(u"LogPath"_s), logs);
    EXPECT_TRUE(HarnessTestAccess::Environment(preset).contains(u"ProcessedResultsPath"_s));
    EXPECT_FALSE(HarnessTestAccess::Environment(preset).contains(u"KestoVersion"_s));
    preset.DisconnectTarget();
}

TEST_F(HarnessTargetTest, SetTargetKeepsTheConnectionForTheSameNameAndDisconnectingAllowsAnother)
{
    AddHandset(u"Alpha"_s, u"Phone"_s);
    AddHandset(u"Beta"_s, u"Phone"_s);
    WriteFile(HandsetFolder(u"Beta"_s) + u"/fs/logs/run.log"_s, "beta log");

    m_harness.SetTarget(u"alpha"_s);
    ASSERT_TRUE(m_harness.ConnectToTarget(QString()));
    const IKestoDevice *first = HarnessTestAccess::Device(m_harness);
    m_harness.SetTarget(u"alpha"_s);
    m_harness.SetTarget(QString());
    EXPECT_EQ(HarnessTestAccess::Device(m_harness), first);
    EXPECT_EQ(HarnessTestAccess::Target(m_harness), u"alpha"_s);

    m_harness.SetTarget(u"beta"_s);
    EXPECT_EQ(HarnessTestAccess::Device(m_harness), nullptr);
    // The next operation connects to the new handset.
    const QString host = WorkPath(u"copied.log"_s);
    EXPECT_TRUE(m_harness.CopyFileFromDevice(u"fs:/logs/run.log"_s, host));
    EXPECT_EQ(Connected(), u"Beta"_s);
    EXPECT_EQ(ReadFile(host), QByteArray("beta log"));
    EXPECT_FALSE(m_harness.CopyFileFromDevice(u"fs:/logs/missing.log"_s, host));

    m_harness.DisconnectTarget();
    EXPECT_EQ(HarnessTestAccess::Device(m_harness), nullptr);
    m_harness.DisconnectTarget();
    ASSERT_TRUE(m_harness.ConnectToTarget(u"alpha"_s));
    EXPECT_EQ(Connected(), u"Alpha"_s);
    QList<ConnectTarget> targets{ConnectTarget(u"stale"_s, QString())};
    EXPECT_EQ(Harness::ListTargets(targets), 2u);
    EXPECT_EQ(targets.size(), 2);
    EXPECT_EQ(targets.first().name, u"Alpha"_s);
}

TEST(HarnessConfiguration, CopyDelayTakesUnsigned32BitDecimalsOnlyAndAnEmptyKitOrPlatformChangesNothing)
{
    const QList<QPair<QString, quint32>> cases{{u"1500"_s, 1500u},    {u"abc"_s, 0u},  {u"0x10"_s, 0u},
                                               {u"-1"_s, 0u},         {QString(), 0u}, {u"4294967295"_s, 4294967295u},
                                               {u"4294967296"_s, 0u}, {u"12abc"_s, 0u}};
    Harness harness;
    for (const auto &[text, expected] : cases) {
        harness.SetCopyDelay(u"7"_s);
        harness.SetCopyDelay(text);
        EXPECT_EQ(HarnessTestAccess::CopyDelay(harness), expected) << text.toStdString();
    }
    harness.SetTestkit(u"kit"_s);
    harness.SetPlatform(u"platform"_s);
    harness.SetTestkit(QString());
    harness.SetPlatform(QString());
    EXPECT_EQ(harness.GetTestkit(), u"kit"_s);
    EXPECT_EQ(harness.GetPlatform(), u"platform"_s);
}

} // namespace
