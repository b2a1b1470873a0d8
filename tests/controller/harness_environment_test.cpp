#include "harnesstest.h"

#include "common/stringhash.h"
#include "environment/testdirectories.h"

#include <QDateTime>
#include <QUuid>

namespace {

using harnesstest::CapturedLog;
using testutil::CurrentDirectory;
using harnesstest::SetModified;
using harnesstest::Toolset;
using testutil::EnvGuard;
using testutil::ReadFile;
using testutil::WriteFile;

using Env = QMap<QString, QString>;

const Env &EnvOf(const Harness &harness)
{
    return HarnessTestAccess::Environment(harness);
}

// Each test gets its own data root, so caches never leak between tests.
class HarnessEnvironmentTest : public ::testing::Test
{
protected:
    HarnessEnvironmentTest() : m_env("KESTIX_DATA_ROOT", m_root.filePath(QStringLiteral("data"))) {}

    void SetUp() override
    {
        ASSERT_TRUE(m_root.isValid());
        m_harness.SetLogger(m_log.log());
    }
    QString RootPath(const QString &name) const { return m_root.filePath(name); }

    // A source file last modified an hour ago, so that a cache written now is
    // newer.
    QString OldFile(const QString &name, const QByteArray &content)
    {
        const QString path = RootPath(name);
        WriteFile(path, content);
        SetModified(path, QDateTime::currentDateTime().addSecs(-3600));
        return path;
    }

    QTemporaryDir m_root;
    EnvGuard m_env;
    Toolset m_toolset;
    CapturedLog m_log;
    Harness m_harness;
};

TEST_F(HarnessEnvironmentTest, NewHarnessHoldsExactlyItsThreeEntries)
{
    EXPECT_EQ(EnvOf(m_harness),
              (Env{{QStringLiteral("DataCachePath"), TestDirectories::GetTestDataPath()},
                   {QStringLiteral("KeyDevicePackSpecified"), QStringLiteral("false")},
                   {QStringLiteral("TestDataSpecified"), QStringLiteral("false")}}));
    EXPECT_TRUE(m_harness.GetTestkit().isEmpty());
    EXPECT_TRUE(m_harness.GetPlatform().isEmpty());
}

TEST_F(HarnessEnvironmentTest, TestDataIsCompiledOnceUntilTheSourceIsTouched)
{
    m_toolset.InstallCompiler();
    const QString source = OldFile(QStringLiteral("data.kar"), "v1");

    m_harness.SetTestData(source);
    const QString cache = EnvOf(m_harness).value(QStringLiteral("TestDataCachePath"));
    EXPECT_EQ(cache, TestDirectories::GetTestDataCacheFilePath(StringHashName(source)));
    EXPECT_EQ(ReadFile(cache), QByteArray("compiled:\nv1"));
    EXPECT_EQ(EnvOf(m_harness).value(QStringLiteral("TestDataSpecified")), QStringLiteral("true"));

    m_harness.SetTestData(source);
    Harness other;
    other.SetTestData(source);
    EXPECT_EQ(m_toolset.Calls().size(), 1);
    EXPECT_EQ(EnvOf(other).value(QStringLiteral("TestDataCachePath")), cache);

    WriteFile(source, "v2");
    SetModified(source, QFileInfo(cache).lastModified().addSecs(10));
    m_harness.SetTestData(source);
    EXPECT_EQ(m_toolset.Calls().size(), 2);
    EXPECT_EQ(ReadFile(cache), QByteArray("compiled:\nv2"));
}

TEST_F(HarnessEnvironmentTest, RelativeAndAbsolutePathsShareOneCache)
{
    m_toolset.InstallCompiler();
    m_toolset.InstallAltCompiler();
    const QString data = OldFile(QStringLiteral("sub/data.kar"), "data");
    const QString pack = OldFile(QStringLiteral("sub/pack.dso"), "<device/>");
    {
        CurrentDirectory cwd(RootPath(QStringLiteral("sub")));
        m_harness.SetTestData(QStringLiteral("../sub/./data.kar"));
        m_harness.SetDPK(QStringLiteral("pack.dso"));
    }
    Harness other;
    other.SetTestData(data);
    other.SetDPK(pack);

    for (const char *key : {"TestDataCachePath", "DevicePack", "DevicePackCachePath"})
        EXPECT_EQ(EnvOf(m_harness).value(QLatin1String(key)), EnvOf(other).value(QLatin1String(key)))
            << key;
    EXPECT_EQ(EnvOf(other).value(QStringLiteral("DevicePack")), pack);
    // Each compiler ran once.
    EXPECT_EQ(m_toolset.Calls().size(), 2);
}

TEST_F(HarnessEnvironmentTest, InvalidSourcesAreReportedAndChangeNothing)
{
    const Env before = EnvOf(m_harness);
    m_harness.SetTestData(RootPath(QStringLiteral("missing.kar")));
    m_harness.SetTestData(m_root.path());
    m_harness.SetDPK(QString());
    EXPECT_EQ(EnvOf(m_harness), before);
    EXPECT_EQ(m_log.Text(), QStringLiteral("Test data %1 is not valid.\n"
                                           "Test data %2 is not valid.\n"
                                           "DPK  is not valid.\n")
                                .arg(RootPath(QStringLiteral("missing.kar")), m_root.path()));
}

TEST_F(HarnessEnvironmentTest, FailedTestDataCompileDropsTheCacheEntryAndTriesAgainNextTime)
{
    m_toolset.InstallCompiler();
    m_toolset.SetFlag("compile_fails", true);
    // "%2" in a file name must not be taken for a placeholder.
    const QString source = OldFile(QStringLiteral("data %2.kar"), "v1");
    const QString cache = TestDirectories::GetTestDataCacheFilePath(StringHashName(source));
    // The failing compiler still writes its output file.
    Toolset::WriteScript(m_toolset.CompilerPath(), "#!/bin/sh\necho broken > \"$5\"\n");

    m_harness.SetTestData(source);
    EXPECT_FALSE(EnvOf(m_harness).contains(QStringLiteral("TestDataCachePath")));
    EXPECT_EQ(EnvOf(m_harness).value(QStringLiteral("TestDataSpecified")), QStringLiteral("true"));
    EXPECT_EQ(m_log.Text(),
              QStringLiteral("Resource Compile Error: %1 can not be compiled into %2.\n")
                  .arg(source, cache));
    EXPECT_FALSE(QFileInfo::exists(cache));

    m_toolset.InstallCompiler();
    m_toolset.SetFlag("compile_fails", false);
    m_harness.SetTestData(source);
    EXPECT_EQ(EnvOf(m_harness).value(QStringLiteral("TestDataCachePath")), cache);
    EXPECT_EQ(ReadFile(cache), QByteArray("compiled:\nv1"));
}

TEST_F(HarnessEnvironmentTest, DevicePackIsCompiledAndFlattened)
{
    m_toolset.InstallAltCompiler();
    const QString source = OldFile(QStringLiteral("device.dso"), "<device><a/></device>\n");
    const QString key = StringHashName(source);

    m_harness.SetDPK(source);
    const Env &env = EnvOf(m_harness);
    EXPECT_EQ(env.value(QStringLiteral("DevicePack")), source);
    EXPECT_EQ(env.value(QStringLiteral("DevicePackCachePath")),
              TestDirectories::GetTestDataCacheFilePath(key));
    const QString dso = TestDirectories::GetDSOCacheFilePath(key);
    EXPECT_EQ(env.value(QStringLiteral("DSOCacheFilePath")), dso);
    EXPECT_EQ(env.value(QStringLiteral("KeyDevicePackSpecified")), QStringLiteral("true"));
    EXPECT_TRUE(ReadFile(dso).contains("<a/>"));

    // Both caches are fresh now: nothing is compiled or flattened again.
    WriteFile(dso, "kept");
    SetModified(dso, QDateTime::currentDateTime().addSecs(-60));
    m_harness.SetDPK(source);
    EXPECT_EQ(m_toolset.Calls().size(), 1);
    EXPECT_EQ(ReadFile(dso), QByteArray("kept"));
}

TEST_F(HarnessEnvironmentTest, DevicePackThatFailsKeepsItsOtherEntries)
{
    m_toolset.InstallAltCompiler();
    m_toolset.SetFlag("alt_empty", true);
    // Not XML: it cannot be flattened either, so the pack itself stands in.
    const QString source = OldFile(QStringLiteral("device.dso"), "not xml <<<");
    const QString cache = TestDirectories::GetTestDataCacheFilePath(StringHashName(source));

    m_harness.SetDPK(source);
    const Env &env = EnvOf(m_harness);
    EXPECT_FALSE(env.contains(QStringLiteral("DevicePackCachePath")));
    EXPECT_EQ(env.value(QStringLiteral("DevicePack")), source);
    EXPECT_EQ(env.value(QStringLiteral("DSOCacheFilePath")), source);
    EXPECT_EQ(env.value(QStringLiteral("KeyDevicePackSpecified")), QStringLiteral("true"));
    EXPECT_TRUE(m_log.Text().endsWith(
        QStringLiteral("Resource Compile Error: %1 can not be compiled into %2.\n").arg(source, cache)));
    // The empty file the compiler left is not taken for a fresh cache.
    EXPECT_FALSE(QFileInfo::exists(cache));
    m_harness.SetDPK(source);
    EXPECT_EQ(m_toolset.Calls().size(), 2);
}

// Platforms "Alpha Pro", "Beta Pro" (the default) and "Gamma"; kits "KitOne",
// "KitTwo" (the default) and "Other".
class HarnessSetupTest : public HarnessEnvironmentTest
{
protected:
    void SetUp() override
    {
        HarnessEnvironmentTest::SetUp();
        for (const char *dir : {"platforms/Alpha Pro", "platforms/Beta Pro", "platforms/Gamma",
                                "kits/KitOne", "kits/KitTwo", "kits/Other"})
            ASSERT_TRUE(QDir().mkpath(RootPath(QLatin1String(dir))));
        m_vars.Set("KESTIX_PLATFORMS_ALL", RootPath(QStringLiteral("platforms")));
        m_vars.Set("KESTIX_PLATFORM", RootPath(QStringLiteral("platforms/Beta Pro/")));
        m_vars.Set("KESTIX_TESTSETS_ALL", RootPath(QStringLiteral("kits")));
        m_vars.Set("KESTIX_TESTSET", RootPath(QStringLiteral("kits/KitTwo")));
    }
    QString Kit(const char *name) const { return RootPath(QStringLiteral("kits/") + QLatin1String(name)); }
    QString PlatformDir(const char *name) const
    {
        return RootPath(QStringLiteral("platforms/") + QLatin1String(name) + QStringLiteral("/pvs/platform"));
    }
    bool RunSetup() { return HarnessTestAccess::SetupEnvironment(m_harness); }

    EnvGuard m_vars;
};

TEST_F(HarnessSetupTest, WithNothingChosenTheDefaultKitAndPlatformAreUsed)
{
    ASSERT_TRUE(RunSetup());
    EXPECT_EQ(m_harness.GetTestkit(), Kit("KitTwo"));
    EXPECT_EQ(m_harness.GetPlatform(), PlatformDir("Beta Pro"));
    EXPECT_FALSE(HarnessTestAccess::KitNotSelected(m_harness));
    EXPECT_EQ(EnvOf(m_harness).value(QStringLiteral("PerlCache")), TestDirectories::GetOatPerlScripts());
    EXPECT_EQ(m_log.Text(), QStringLiteral("KVK: %1Platform: %2").arg(Kit("KitTwo"), PlatformDir("Beta Pro")));
}

TEST_F(HarnessSetupTest, OnlyAPlatformLoadsTheDefaultKitAsNotSelected)
{
    m_harness.SetPlatform(QStringLiteral("ALPHA"));
    ASSERT_TRUE(RunSetup());
    EXPECT_EQ(m_harness.GetTestkit(), Kit("KitTwo"));
    EXPECT_EQ(m_harness.GetPlatform(), PlatformDir("Alpha Pro"));
    EXPECT_TRUE(HarnessTestAccess::KitNotSelected(m_harness));

    // Setting up again after an unrelated change neither selects the kit nor
    // nests the platform folder a second time.
    m_harness.SetFamily(QStringLiteral("family"), QString());
    ASSERT_FALSE(HarnessTestAccess::EnvironmentReady(m_harness));
    ASSERT_TRUE(RunSetup());
    EXPECT_TRUE(HarnessTestAccess::KitNotSelected(m_harness));
    EXPECT_EQ(m_harness.GetPlatform(), PlatformDir("Alpha Pro"));

    // A kit chosen by the host is selected.
    m_harness.SetTestkit(QStringLiteral("other"));
    ASSERT_TRUE(RunSetup());
    EXPECT_EQ(m_harness.GetTestkit(), Kit("Other"));
    EXPECT_FALSE(HarnessTestAccess::KitNotSelected(m_harness));
}

TEST_F(HarnessSetupTest, KitAndPlatformNamesMatchTheFirstListedEntry)
{
    m_harness.SetTestkit(QStringLiteral("Kit"));
    // "Gamma" is not a professional platform, so it cannot be chosen.
    m_harness.SetPlatform(QStringLiteral("a"));
    ASSERT_TRUE(RunSetup());
    EXPECT_EQ(m_harness.GetTestkit(), Kit("KitOne"));
    EXPECT_EQ(m_harness.GetPlatform(), PlatformDir("Alpha Pro"));
}

TEST_F(HarnessSetupTest, PathsThatMatchNoNameAreMadeAbsolute)
{
    CurrentDirectory cwd(m_root.path());
    m_harness.SetTestkit(QStringLiteral("elsewhere/kit"));
    m_harness.SetPlatform(QStringLiteral("sdk/../sdk/p"));
    ASSERT_TRUE(RunSetup());
    EXPECT_EQ(m_harness.GetTestkit(), RootPath(QStringLiteral("elsewhere/kit")));
    EXPECT_EQ(m_harness.GetPlatform(), RootPath(QStringLiteral("sdk/p/pvs/platform")));
}

TEST_F(HarnessSetupTest, TheRunIdentifierLastsUntilTheKitChanges)
{
    ASSERT_TRUE(RunSetup());
    const QString runId = EnvOf(m_harness).value(QStringLiteral("TestRunID"));
    EXPECT_FALSE(QUuid::fromString(runId).isNull());
    EXPECT_TRUE(runId.startsWith(QLatin1Char('{')) && runId.endsWith(QLatin1Char('}')));

    ASSERT_TRUE(RunSetup());
    EXPECT_EQ(EnvOf(m_harness).value(QStringLiteral("TestRunID")), runId);

    m_harness.SetTestkit(QStringLiteral("KitOne"));
    ASSERT_TRUE(RunSetup());
    EXPECT_NE(EnvOf(m_harness).value(QStringLiteral("TestRunID")), runId);
}

TEST_F(HarnessSetupTest, WithoutAnyKitSetupFails)
{
    m_vars.Set("KESTIX_TESTSETS_ALL", RootPath(QStringLiteral("nokits")));
    m_harness.SetPlatform(QStringLiteral("beta"));
    EXPECT_FALSE(RunSetup());
    EXPECT_EQ(m_log.Text(), QStringLiteral("KVK not found.  A Kesto Validation Kit is required"));
    EXPECT_FALSE(HarnessTestAccess::EnvironmentReady(m_harness));
}

TEST_F(HarnessSetupTest, UnresolvedDefaultsAreReportedButDoNotFail)
{
    m_vars.Set("KESTIX_TESTSET", RootPath(QStringLiteral("kits/NotInstalled")));
    m_vars.Unset("KESTIX_PLATFORM");
    ASSERT_TRUE(RunSetup());
    EXPECT_EQ(m_harness.GetTestkit(), QStringLiteral("*"));
    EXPECT_EQ(m_harness.GetPlatform(), QStringLiteral("*"));
    EXPECT_EQ(m_log.Text(), QStringLiteral("Default KVK not foundDefault platform not found"));
}

} // namespace
