#include "harnesstest.h"

#include "common/stringhash.h"
#include "environment/testdirectories.h"

#include <QDateTime>
#include <QElapsedTimer>
#include <QUuid>

namespace {

using Env = QMap<QString, QString>;

// Each test gets its own data root, so caches never leak between tests.
class HarnessEnvironmentTest : public ::testing::Test
{
protected:
    HarnessEnvironmentTest() : m_env("KESTIX_DATA_ROOT", m_root.filePath(u"data"_s)) { }

    void SetUp() override
    {
        ASSERT_TRUE(m_root.isValid());
        m_harness.SetLogger(m_log.log());
    }
    QString RootPath(const QString &name) const { return m_root.filePath(name); }
    static Env &EnvOf(Harness &harness) { return HarnessTestAccess::Environment(harness); }

    // A source file last modified an hour ago, so that a cache written now is newer.
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

using HarnessCompileTest = HarnessEnvironmentTest;

// The name would run commands if it ever reached a shell.
TEST_F(HarnessCompileTest, UpperCaseKsxIsConvertedThenCompiledWithItsNamePassedUnchangedAndTheCarRemoved)
{
    m_toolset.InstallCompiler();
    m_toolset.InstallAltCompiler();
    CurrentDirectory cwd(m_root.path());
    const QString name = u"my data \"q\" 'x' $HOME $(touch injected) `touch injected2`; x"_s;
    const QString source = RootPath(name + u".KSX"_s), car = RootPath(name + u".car"_s);
    const QString output = RootPath(u"out $PATH \"1\".kar"_s);
    WriteFile(source, "<resources/>\n");

    EXPECT_TRUE(m_harness.CompileResource(source, output));
    const QList<QStringList> calls = m_toolset.Calls();
    ASSERT_EQ(calls.size(), 2);
    EXPECT_EQ(calls[0], (QStringList{u"-convert"_s, u"-infile"_s, source, u"-outfile"_s, car}));
    EXPECT_EQ(calls[1], (QStringList{u"-compile"_s, u"-infile"_s, car, u"-outfile"_s, output}));
    EXPECT_FALSE(QFileInfo::exists(car));
    EXPECT_EQ(ReadFile(output), QByteArray("compiled:\n<resources/>\n"));
    // Only the success lines reach the log, each on a line of its own.
    EXPECT_EQ(m_log.Text(), u"Successfully converted file %1\nSuccessfully compiled %2\n"_s.arg(source, output));

    const QString altOutput = RootPath(u"dpk $(touch injected3).kar"_s);
    EXPECT_TRUE(m_harness.AltCompileResource(source, altOutput));
    EXPECT_EQ(ReadFile(altOutput), QByteArray("<resources/>\n"));
    EXPECT_EQ(m_toolset.Calls().value(2), (QStringList{u"-nh"_s, u"-o"_s, altOutput, source}));
    EXPECT_FALSE(m_log.Text().contains(u"Compiliation"_s));
    for (const char *file : {"injected", "injected2", "injected3"})
        EXPECT_FALSE(QFileInfo::exists(RootPath(QString::fromLatin1(file)))) << file;
}

TEST_F(HarnessCompileTest, OnlyKsxIsConvertedAndAFailedStepKeepsTheSourceAndNoIntermediate)
{
    m_toolset.InstallCompiler();
    // The source, the toolset flag that fails a step (or null), what the compiler reads ("car": the converted
    // intermediate) and whether the compile succeeds.
    const struct
    {
        const char *source, *failing, *compileInput;
        bool compiled;
    } rows[] = {{"data.kar", nullptr, "data.kar", true},
                {"data.ksx.txt", nullptr, "data.ksx.txt", true},
                {"ksx", nullptr, "ksx", true},
                {"strings.ksx", "convert_fails", "strings.ksx", true},
                {"strings.ksx", "compile_fails", "car", false}};
    for (const auto &row : rows) {
        SCOPED_TRACE(row.source + std::string(" ") + (row.failing ? row.failing : ""));
        const QString source = RootPath(QString::fromLatin1(row.source)), car = RootPath(u"strings.car"_s);
        WriteFile(source, "src");
        if (row.failing)
            m_toolset.SetFlag(row.failing, true);
        const qsizetype before = m_toolset.Calls().size();
        EXPECT_EQ(m_harness.CompileResource(source, RootPath(u"out.kar"_s)), row.compiled);
        if (row.failing)
            m_toolset.SetFlag(row.failing, false);

        const QList<QStringList> calls = m_toolset.Calls().mid(before);
        ASSERT_EQ(calls.size(), source.endsWith(u".ksx"_s) ? 2 : 1);
        EXPECT_EQ(calls.last().value(0), u"-compile"_s);
        EXPECT_EQ(calls.last().value(2), qstrcmp(row.compileInput, "car") ? source : car);
        EXPECT_TRUE(QFileInfo::exists(source));
        EXPECT_FALSE(QFileInfo::exists(car));
    }
    EXPECT_FALSE(m_log.Text().contains(u"conversion error"_s));
}

TEST_F(HarnessCompileTest, MissingUnstartableOrFailingCompilersFailAtOnceWithTheCommandAndTheToolOutput)
{
    const QString source = RootPath(u"strings.ksx"_s), output = RootPath(u"out.kar"_s);
    WriteFile(source, "src");
    // A stale output from an earlier run must not pass for a compiled one.
    WriteFile(output, "stale");
    const QString failed = u"Device Pack Compiliation failed.\n\tCommand:\"%1\"-nh -o %2 %3\n\n"_s.arg(
        m_toolset.AltCompilerPath(), output, source);

    QElapsedTimer real;
    real.start();
    EXPECT_FALSE(m_harness.CompileResource(source, output));
    EXPECT_FALSE(m_harness.AltCompileResource(source, output));
    EXPECT_EQ(m_log.Text(), failed);

    // Present but not executable.
    WriteFile(m_toolset.CompilerPath(), "#!/bin/sh\necho Successfully compiled\n");
    WriteFile(m_toolset.AltCompilerPath(), "#!/bin/sh\n");
    EXPECT_FALSE(m_harness.CompileResource(source, output));
    EXPECT_FALSE(m_harness.AltCompileResource(source, output));
    EXPECT_LT(real.elapsed(), 10000);

    // Running but leaving an empty output.
    m_toolset.InstallAltCompiler();
    m_toolset.SetFlag("alt_empty", true);
    const qsizetype logged = m_log.Text().size();
    EXPECT_FALSE(m_harness.AltCompileResource(source, output));
    EXPECT_TRUE(QFileInfo::exists(output));
    EXPECT_EQ(m_log.Text().mid(logged), failed + u"kestorc: syntax error\nstderr line\n"_s);
}

TEST_F(HarnessEnvironmentTest, TestDataIsCompiledOnceUntilTheSourceIsTouched)
{
    m_toolset.InstallCompiler();
    const QString source = OldFile(u"data.kar"_s, "v1");

    m_harness.SetTestData(source);
    const QString cache = EnvOf(m_harness).value(u"TestDataCachePath"_s);
    EXPECT_EQ(cache, TestDirectories::GetTestDataCacheFilePath(StringHashName(source)));
    EXPECT_EQ(ReadFile(cache), QByteArray("compiled:\nv1"));
    EXPECT_EQ(EnvOf(m_harness).value(u"TestDataSpecified"_s), u"true"_s);

    m_harness.SetTestData(source);
    EXPECT_EQ(m_toolset.Calls().size(), 1);

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
    const QString data = OldFile(u"sub/data.kar"_s, "data"), pack = OldFile(u"sub/pack.dso"_s, "<device/>");
    {
        CurrentDirectory cwd(RootPath(u"sub"_s));
        m_harness.SetTestData(u"../sub/./data.kar"_s);
        m_harness.SetDPK(u"pack.dso"_s);
    }
    Harness other;
    other.SetTestData(data);
    other.SetDPK(pack);

    for (const char *key : {"TestDataCachePath", "DevicePack", "DevicePackCachePath"})
        EXPECT_EQ(EnvOf(m_harness).value(QLatin1String(key)), EnvOf(other).value(QLatin1String(key))) << key;
    EXPECT_EQ(EnvOf(other).value(u"DevicePack"_s), pack);
    // Each compiler ran once.
    EXPECT_EQ(m_toolset.Calls().size(), 2);
}

TEST_F(HarnessEnvironmentTest, NewHarnessHoldsExactlyItsThreeEntriesAndInvalidSourcesChangeNothing)
{
    EXPECT_TRUE(m_harness.GetTestkit().isEmpty());
    EXPECT_TRUE(m_harness.GetPlatform().isEmpty());
    m_harness.SetTestData(RootPath(u"missing.kar"_s));
    m_harness.SetTestData(m_root.path());
    m_harness.SetDPK(QString());
    EXPECT_EQ(EnvOf(m_harness),
              (Env{{u"DataCachePath"_s, TestDirectories::GetTestDataPath()},
                   {u"KeyDevicePackSpecified"_s, u"false"_s},
                   {u"TestDataSpecified"_s, u"false"_s}}));
    EXPECT_EQ(m_log.Text(),
              u"Test data %1 is not valid.\nTest data %2 is not valid.\nDPK  is not valid.\n"_s.arg(
                  RootPath(u"missing.kar"_s), m_root.path()));
}

TEST_F(HarnessEnvironmentTest, FailedTestDataCompileDropsTheCacheEntryAndTriesAgainNextTime)
{
    m_toolset.InstallCompiler();
    m_toolset.SetFlag("compile_fails", true);
    // "%2" in a file name must not be taken for a placeholder.
    const QString source = OldFile(u"data %2.kar"_s, "v1");
    const QString cache = TestDirectories::GetTestDataCacheFilePath(StringHashName(source));
    // The failing compiler still writes its output file.
    Toolset::WriteScript(m_toolset.CompilerPath(), "#!/bin/sh\necho broken > \"$5\"\n");

    m_harness.SetTestData(source);
    EXPECT_FALSE(EnvOf(m_harness).contains(u"TestDataCachePath"_s));
    EXPECT_EQ(EnvOf(m_harness).value(u"TestDataSpecified"_s), u"true"_s);
    EXPECT_EQ(m_log.Text(), u"Resource Compile Error: %1 can not be compiled into %2.\n"_s.arg(source, cache));
    EXPECT_FALSE(QFileInfo::exists(cache));

    m_toolset.InstallCompiler();
    m_toolset.SetFlag("compile_fails", false);
    m_harness.SetTestData(source);
    EXPECT_EQ(EnvOf(m_harness).value(u"TestDataCachePath"_s), cache);
    EXPECT_EQ(ReadFile(cache), QByteArray("compiled:\nv1"));
}

TEST_F(HarnessEnvironmentTest, DevicePackIsCompiledAndFlattenedOrOnFailureKeepsItsOtherEntries)
{
    m_toolset.InstallAltCompiler();
    const QString source = OldFile(u"device.dso"_s, "<device><a/></device>\n"), key = StringHashName(source);

    m_harness.SetDPK(source);
    const Env &env = EnvOf(m_harness);
    EXPECT_EQ(env.value(u"DevicePack"_s), source);
    EXPECT_EQ(env.value(u"DevicePackCachePath"_s), TestDirectories::GetTestDataCacheFilePath(key));
    const QString dso = TestDirectories::GetDSOCacheFilePath(key);
    EXPECT_EQ(env.value(u"DSOCacheFilePath"_s), dso);
    EXPECT_EQ(env.value(u"KeyDevicePackSpecified"_s), u"true"_s);
    EXPECT_TRUE(ReadFile(dso).contains("<a/>"));

    // Both caches are fresh now: nothing is compiled or flattened again.
    WriteFile(dso, "kept");
    SetModified(dso, QDateTime::currentDateTime().addSecs(-60));
    m_harness.SetDPK(source);
    EXPECT_EQ(m_toolset.Calls().size(), 1);
    EXPECT_EQ(ReadFile(dso), QByteArray("kept"));

    // A pack that fails keeps its other entries. Not XML, it cannot be flattened either, so the pack itself stands in.
    m_toolset.SetFlag("alt_empty", true);
    const QString bad = OldFile(u"bad.dso"_s, "not xml <<<");
    const QString cache = TestDirectories::GetTestDataCacheFilePath(StringHashName(bad));
    m_harness.SetDPK(bad);
    EXPECT_FALSE(env.contains(u"DevicePackCachePath"_s));
    EXPECT_EQ(env.value(u"DevicePack"_s), bad);
    EXPECT_EQ(env.value(u"DSOCacheFilePath"_s), bad);
    EXPECT_EQ(env.value(u"KeyDevicePackSpecified"_s), u"true"_s);
    EXPECT_TRUE(m_log.Text().endsWith(u"Resource Compile Error: %1 can not be compiled into %2.\n"_s.arg(bad, cache)));
    // The empty file the compiler left is not taken for a fresh cache.
    EXPECT_FALSE(QFileInfo::exists(cache));
    m_harness.SetDPK(bad);
    EXPECT_EQ(m_toolset.Calls().size(), 3);
}

// Platforms "Alpha Pro", "Beta Pro" (the default) and "Gamma"; kits "KitOne", "KitTwo" (the default) and "Other".
class HarnessSetupTest : public HarnessEnvironmentTest
{
protected:
    void SetUp() override
    {
        HarnessEnvironmentTest::SetUp();
        for (const char *dir : {"platforms/Alpha Pro", "platforms/Beta Pro", "platforms/Gamma", "kits/KitOne",
                                "kits/KitTwo", "kits/Other"})
            ASSERT_TRUE(QDir().mkpath(RootPath(QLatin1String(dir))));
        m_vars.Set("KESTIX_PLATFORMS_ALL", RootPath(u"platforms"_s));
        m_vars.Set("KESTIX_PLATFORM", RootPath(u"platforms/Beta Pro/"_s));
        m_vars.Set("KESTIX_TESTSETS_ALL", RootPath(u"kits"_s));
        m_vars.Set("KESTIX_TESTSET", RootPath(u"kits/KitTwo"_s));
    }
    bool RunSetup() { return HarnessTestAccess::SetupEnvironment(m_harness); }

    EnvGuard m_vars;
};

TEST_F(HarnessSetupTest, KitAndPlatformAreTheDefaultsTheFirstListedEntryNamedOrAPath)
{
    CurrentDirectory cwd(m_root.path());
    // "Gamma" is not a professional platform, so "a" cannot choose it.
    const struct
    {
        const char *kit, *platform, *expectedKit, *expectedPlatform;
        bool kitNotSelected;
    } rows[] = {{"", "", "kits/KitTwo", "platforms/Beta Pro/pvs/platform", false},
                {"", "ALPHA", "kits/KitTwo", "platforms/Alpha Pro/pvs/platform", true},
                {"Kit", "a", "kits/KitOne", "platforms/Alpha Pro/pvs/platform", false},
                {"elsewhere/kit", "sdk/../sdk/p", "elsewhere/kit", "sdk/p/pvs/platform", false}};
    for (const auto &row : rows) {
        SCOPED_TRACE(row.kit + std::string(" ") + row.platform);
        CapturedLog log;
        Harness harness;
        harness.SetLogger(log.log());
        harness.SetTestkit(QString::fromLatin1(row.kit));
        harness.SetPlatform(QString::fromLatin1(row.platform));
        ASSERT_TRUE(HarnessTestAccess::SetupEnvironment(harness));
        EXPECT_EQ(harness.GetTestkit(), RootPath(QString::fromLatin1(row.expectedKit)));
        EXPECT_EQ(harness.GetPlatform(), RootPath(QString::fromLatin1(row.expectedPlatform)));
        EXPECT_EQ(HarnessTestAccess::KitNotSelected(harness), row.kitNotSelected);
        EXPECT_EQ(EnvOf(harness).value(u"PerlCache"_s), TestDirectories::GetOatPerlScripts());
        EXPECT_EQ(log.Text(), u"KVK: %1Platform: %2"_s.arg(harness.GetTestkit(), harness.GetPlatform()));
    }
    // The host's lists replace what they are given: the professional platforms, every kit.
    QList<Platform> platforms(3);
    QList<TestKit> kits(3);
    EXPECT_EQ(Harness::ListPlatforms(platforms), 2u);
    EXPECT_EQ(Harness::ListTestKits(kits), 3u);
    EXPECT_EQ(platforms.at(0).name + u' ' + kits.at(0).name, u"Alpha KitOne"_s);
}

TEST_F(HarnessSetupTest, SettingUpAgainKeepsTheRunAndTheUnselectedKitUntilTheHostChoosesAKit)
{
    m_harness.SetPlatform(u"ALPHA"_s);
    ASSERT_TRUE(RunSetup());
    const QString runId = EnvOf(m_harness).value(u"TestRunID"_s);
    EXPECT_FALSE(QUuid::fromString(runId).isNull());
    EXPECT_TRUE(runId.startsWith(u'{') && runId.endsWith(u'}'));
    ASSERT_TRUE(RunSetup());
    EXPECT_EQ(EnvOf(m_harness).value(u"TestRunID"_s), runId);

    // A new family draws a new run identifier, but neither selects the kit nor nests the platform folder a second time.
    m_harness.SetFamily(u"family"_s, QString());
    ASSERT_FALSE(HarnessTestAccess::EnvironmentReady(m_harness));
    ASSERT_TRUE(RunSetup());
    EXPECT_TRUE(HarnessTestAccess::KitNotSelected(m_harness));
    EXPECT_EQ(m_harness.GetPlatform(), RootPath(u"platforms/Alpha Pro/pvs/platform"_s));
    const QString familyRunId = EnvOf(m_harness).value(u"TestRunID"_s);
    EXPECT_NE(familyRunId, runId);

    m_harness.SetTestkit(u"other"_s);
    ASSERT_TRUE(RunSetup());
    EXPECT_EQ(m_harness.GetTestkit(), RootPath(u"kits/Other"_s));
    EXPECT_FALSE(HarnessTestAccess::KitNotSelected(m_harness));
    EXPECT_NE(EnvOf(m_harness).value(u"TestRunID"_s), familyRunId);
}

TEST_F(HarnessSetupTest, WithoutAnyKitSetupFails)
{
    m_vars.Set("KESTIX_TESTSETS_ALL", RootPath(u"nokits"_s));
    m_harness.SetPlatform(u"beta"_s);
    EXPECT_FALSE(RunSetup());
    EXPECT_EQ(m_log.Text(), u"KVK not found.  A Kesto Validation Kit is required"_s);
    EXPECT_FALSE(HarnessTestAccess::EnvironmentReady(m_harness));
}

TEST_F(HarnessSetupTest, UnresolvedDefaultsAreReportedButDoNotFail)
{
    m_vars.Set("KESTIX_TESTSET", RootPath(u"kits/NotInstalled"_s));
    m_vars.Unset("KESTIX_PLATFORM");
    ASSERT_TRUE(RunSetup());
    EXPECT_EQ(m_harness.GetTestkit(), u"*"_s);
    EXPECT_EQ(m_harness.GetPlatform(), u"*"_s);
    EXPECT_EQ(m_log.Text(), u"Default KVK not foundDefault platform not found"_s);
}

} // namespace
