// OAT modules and the OAT framework: derived names, run options, the
// framework's data files and the Perl post-processing.

#include "log/log.h"
#include "modules/oatframework.h"
#include "modules/oattestmodule.h"
#include "support/mockdevice.h"
#include "support/testutil.h"

#include <QDir>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using ::testing::_;
using ::testing::DoAll;
using ::testing::NiceMock;
using ::testing::Return;
using ::testing::SetArgReferee;

namespace {

SysResource Program(const QByteArray &name)
{
    SysResource program;
    program.type = 0x01010100;
    program.SetProperty("Program Name", name);
    return program;
}

QSharedPointer<_CompilerVariant> Variant(const QString &package)
{
    QSharedPointer<_CompilerVariant> variant(new _CompilerVariant);
    variant->name = QStringLiteral("v");
    variant->arch = IKestoDevice::PLATFORM_WIN32;
    variant->build = QStringLiteral("Release");
    variant->packagePath = package;
    return variant;
}

struct NameCase {
    const char *moduleName;
    const char *mifname;
    const char *directory;
    const char *mif;
    const char *logBase;
};

class OatNames : public ::testing::TestWithParam<NameCase>
{
};

} // namespace

TEST_P(OatNames, DerivesHandsetNamesFromTheModuleName)
{
    const NameCase &c = GetParam();
    OatTestModule module;
    module.moduleName = QString::fromLatin1(c.moduleName);
    module.mifname = QString::fromLatin1(c.mifname);
    EXPECT_EQ(module.HandsetDirectoryName(), QLatin1String(c.directory));
    EXPECT_EQ(module.MifFileName(), QLatin1String(c.mif));
    EXPECT_EQ(module.LogBasePath(), QLatin1String(c.logBase));
}

INSTANTIATE_TEST_SUITE_P(
    Modules, OatNames,
    ::testing::Values(NameCase{"OatTimer", "", "oattimer", "oattimer.mif", "fs:/shared/pek/log/timer"},
                      NameCase{"Timer", "", "oattimer", "oattimer.mif", "fs:/shared/pek/log/timer"},
                      NameCase{"OATNet", "Net_Suite.mif", "oatnet", "Net_Suite.mif", "fs:/shared/pek/log/net"},
                      NameCase{"", "", "oat", "oat.mif", "fs:/shared/pek/log/"}));

namespace {

class OatRun : public ::testing::Test
{
protected:
    void SetUp() override
    {
        log.SetLogPath(dir.filePath(QStringLiteral("log.txt")));
        module.SetLogger(&log);
        module.moduleName = QStringLiteral("OatTimer");
        module.targets.insert(QStringLiteral("v"), Variant(QStringLiteral("/oattimer.kestix")));
        device.platform = IKestoDevice::PLATFORM_WIN32;
        ON_CALL(device, InstallPackage(_)).WillByDefault(Return(0u));
        ON_CALL(device, StartApplet(_, _)).WillByDefault(Return(0u));
    }
    // The applet arguments of one run with the given option and cases.
    QString ArgumentsFor(const QString &option, const QStringList &cases)
    {
        QString arguments;
        module.SetRunOption(option);
        module.SetTestCases(cases);
        EXPECT_CALL(device, StartApplet(0x01010001u, _))
            .WillOnce(DoAll(::testing::SaveArg<1>(&arguments), Return(0u)));
        EXPECT_TRUE(module.Run(&device, env));
        EXPECT_TRUE(module.runOption.isEmpty());
        return arguments;
    }
    QString LogText() { return QString::fromLatin1(testutil::ReadFile(dir.filePath(QStringLiteral("log.txt")))); }

    QTemporaryDir dir;
    Log log;
    OatTestModule module;
    NiceMock<MockDevice> device;
    QMap<QString, QString> env;
};

} // namespace

TEST_F(OatRun, ArgumentsNameTheModeTheProgramAndTheCases)
{
    module.programs << Program("OatSuite1");
    EXPECT_EQ(module.ModuleName(), QStringLiteral("OatSuite1"));
    EXPECT_EQ(ArgumentsFor(QString(), {}), QStringLiteral("-dk -ra OatSuite1"));
    EXPECT_EQ(ArgumentsFor(QStringLiteral("Automated"), {}), QStringLiteral("-dk -ru OatSuite1"));
    EXPECT_EQ(ArgumentsFor(QStringLiteral("inter"), {}), QStringLiteral("-dk -ri OatSuite1"));
    EXPECT_EQ(ArgumentsFor(QStringLiteral("ALL"), {}), QStringLiteral("-dk -ra OatSuite1"));
    EXPECT_EQ(ArgumentsFor(QStringLiteral("Interactive"), {QStringLiteral("t1"), QStringLiteral("t2")}),
              QStringLiteral("-dk -rs OatSuite1,t1,t2"));
    EXPECT_EQ(ArgumentsFor(QStringLiteral("Sometimes"), {}), QStringLiteral("-dk -ra OatSuite1"));
    EXPECT_TRUE(LogText().contains(QStringLiteral("OatTestModule::Unknown Run Optionsometimes")));
}

TEST_F(OatRun, PublishesTheModuleInformationFileBeforeStarting)
{
    module.programs << Program("OatSuite1");
    ::testing::InSequence order;
    EXPECT_CALL(device, InstallPackage(QStringLiteral("/oattimer.kestix"))).WillOnce(Return(0u));
    EXPECT_CALL(device, CopyOnDevice(QStringLiteral("fs:/usermods/oattimer/oattimer.mif"),
                                     QStringLiteral("fs:/mif/oattimer.mif"))).WillOnce(Return(true));
    EXPECT_CALL(device, StartApplet(0x01010001u, _)).WillOnce(Return(0u));
    EXPECT_CALL(device, IsAppletRunning(0x01010001u)).WillOnce(Return(true)).WillOnce(Return(false));
    EXPECT_TRUE(module.Run(&device, env));
}

TEST_F(OatRun, WithoutAProgramNothingIsInstalled)
{
    module.SetRunOption(QStringLiteral("auto"));
    EXPECT_CALL(device, InstallPackage(_)).Times(0);
    EXPECT_FALSE(module.Run(&device, env));
    EXPECT_TRUE(module.runOption.isEmpty());
}

TEST_F(OatRun, StartFailureIsReported)
{
    module.programs << Program("OatSuite1");
    device.lastError = 0x80004005u;
    EXPECT_CALL(device, StartApplet(_, _)).WillOnce(Return(1u));
    EXPECT_FALSE(module.Run(&device, env));
    EXPECT_TRUE(LogText().contains(QStringLiteral("OatTestModule::Run error: 2147500037(0x80004005)")));
}

TEST_F(OatRun, PrefersTheULogAndRemovesLogsAndPublishedFile)
{
    EXPECT_CALL(device, FileExists(QStringLiteral("fs:/shared/pek/log/timer_u.oat"))).WillRepeatedly(Return(true));
    EXPECT_CALL(device, FileExists(QStringLiteral("fs:/shared/pek/log/timer.oat"))).Times(0);
    QStringList paths{QStringLiteral("stale")};
    ASSERT_TRUE(module.GetLogFilePaths(&device, paths));
    EXPECT_EQ(paths, QStringList{QStringLiteral("fs:/shared/pek/log/timer_u.oat")});

    EXPECT_CALL(device, RemoveDirectory(QStringLiteral("fs:/usermods/OatTimer"))).WillOnce(Return(0u));
    EXPECT_CALL(device, DeleteFile(QStringLiteral("fs:/shared/pek/log/timer_u.oat"))).WillOnce(Return(0u));
    EXPECT_CALL(device, DeleteFile(QStringLiteral("fs:/mif/oattimer.mif"))).WillOnce(Return(0u));
    EXPECT_FALSE(module.RemoveTest(&device));
}

TEST(OatFramework, LoadPushesBothCachesAndRestoresTheFlags)
{
    NiceMock<MockDevice> device;
    device.platform = IKestoDevice::PLATFORM_WIN32;
    _OatFramework framework;
    QMap<QString, QString> env{{QStringLiteral("TestDataSpecified"), QStringLiteral("false")},
                               {QStringLiteral("TestDataCachePath"), QStringLiteral("/cache/td.kar")},
                               {QStringLiteral("DevicePackCachePath"), QStringLiteral("/cache/dp.kar")}};
    EXPECT_FALSE(framework.Load(&device, env));

    framework.variants.insert(QStringLiteral("v"), Variant(QStringLiteral("/oat.kestix")));
    EXPECT_CALL(device, InstallPackage(QStringLiteral("/oat.kestix"))).WillOnce(Return(0u));
    EXPECT_CALL(device, FindModule(0x01010001u, _))
        .WillRepeatedly(DoAll(SetArgReferee<1>(QStringLiteral("fs:/usermods/oat/")), Return(0u)));
    EXPECT_CALL(device, CopyFileToDevice(QStringLiteral("/cache/td.kar"), QStringLiteral("fs:/usermods/oat/testdata.kar")));
    EXPECT_CALL(device, CopyFileToDevice(QStringLiteral("/cache/dp.kar"), QStringLiteral("fs:/usermods/oat/testdata2.kar")));
    ASSERT_TRUE(framework.Load(&device, env));
    EXPECT_FALSE(env.contains(QStringLiteral("KeyDevicePackSpecified")));
    EXPECT_EQ(env.value(QStringLiteral("TestDataSpecified")), QStringLiteral("false"));

    // A later PostLoad pushes only what its flags ask for.
    ::testing::Mock::VerifyAndClearExpectations(&device);
    env.insert(QStringLiteral("TestDataSpecified"), QStringLiteral("true"));
    env.remove(QStringLiteral("TestDataCachePath"));
    EXPECT_CALL(device, CopyFileToDevice(_, _)).Times(0);
    EXPECT_TRUE(framework.PostLoad(&device, env));
}

TEST(OatFramework, IsLoadedUsesTheFixedClassIdAndUnloadRemovesEveryOatFolder)
{
    NiceMock<MockDevice> device;
    _OatFramework framework;
    framework.classId = 5;
    EXPECT_CALL(device, FindModule(0x01010001u, _)).WillRepeatedly(Return(1u));
    EXPECT_CALL(device, ListDirectory(QStringLiteral("fs:/~0x01010001"), _))
        .WillOnce(ListingOf({QStringLiteral("fs:/~0x01010001/oat.mif")}));
    EXPECT_TRUE(framework.IsLoaded(&device));

    ::testing::InSequence order;
    QMap<QString, QString> env;
    EXPECT_CALL(device, RemoveDirectory(QStringLiteral("fs:/usermods/oat/")));
    EXPECT_CALL(device, RemoveDirectory(QStringLiteral("fs:/usermods/oatinterfaceext/")));
    EXPECT_CALL(device, RemoveDirectory(QStringLiteral("fs:/usermods/oatresourceext/")));
    framework.Unload(&device, env);
}

namespace {

// A stand-in for the kit's post-processing script: it records its arguments
// and working folder, prints on both channels and leaves one output file per
// raw log in the temporary folder.
const QByteArray kScript = R"perl(use strict;
use Cwd;
my ($source, $temp, $pack, $platform) = @ARGV;
print "args:", join("|", @ARGV), "\n";
print STDERR "cwd:", getcwd(), "\n";
opendir(my $dh, $source) or die "no source $source";
for my $name (grep { /\.oat$/ } readdir($dh)) {
    open(my $in, "<", "$source/$name") or die;
    open(my $out, ">", "$temp/$name.html") or die;
    print $out "processed with $pack on $platform\n", <$in>;
    close($out);
}
)perl";

class OatPostProcess : public ::testing::Test
{
protected:
    void SetUp() override
    {
        perlCache = dir.filePath(QStringLiteral("perl"));
        logs = dir.filePath(QStringLiteral("logs"));
        raw = logs + QStringLiteral("/oatRawLogs");
        testutil::WriteFile(perlCache + QStringLiteral("/PostProcess3.pl"), kScript);
        testutil::WriteFile(raw + QStringLiteral("/timer-2026.oat"), "@Timer\nModuleVer: 1\n");
        log.SetLogPath(dir.filePath(QStringLiteral("log.txt")));
        module.SetLogger(&log);
        module.moduleName = QStringLiteral("Timer");
        module.AddDesktopLogFile(raw + QStringLiteral("/timer-2026.oat"));
        env = {{QStringLiteral("PerlCache"), perlCache},
               {QStringLiteral("TestRunID"), QStringLiteral("{r}")},
               {QStringLiteral("OatRawLogPath"), raw},
               {QStringLiteral("LogPath"), logs},
               {QStringLiteral("DevicePack"), QStringLiteral("/kit/dp.xml")},
               {QStringLiteral("DSOCacheFilePath"), QStringLiteral("/cache/dp.dso")},
               {QStringLiteral("Platform"), QStringLiteral("/sdk/pvs/platform")}};
    }
    QString LogText() { return QString::fromLatin1(testutil::ReadFile(dir.filePath(QStringLiteral("log.txt")))); }

    QTemporaryDir dir;
    QString perlCache;
    QString logs;
    QString raw;
    Log log;
    OatTestModule module;
    QMap<QString, QString> env;
};

} // namespace

TEST_F(OatPostProcess, RunsTheScriptAndCollectsItsOutput)
{
    if (!testutil::HaveProgram(QStringLiteral("perl")))
        GTEST_SKIP() << "perl is not installed";
    module.PostProcess(env);

    const QString output = logs + QStringLiteral("/timer-2026.oat.html");
    EXPECT_EQ(module.desktopLogFiles, QStringList{output});
    EXPECT_EQ(testutil::ReadFile(output),
              QByteArray("processed with /cache/dp.dso on /sdk/pvs/platform\n@Timer\n"
                         "GUID:{r}\nManifest Name:Timer\nID Hash:\nModuleVer: 1\n\n"));
    EXPECT_FALSE(QFileInfo::exists(logs + QStringLiteral("/tempPPLogs")));
    const QString text = LogText();
    EXPECT_TRUE(text.contains(QStringLiteral("   Post Processing Oat")));
    EXPECT_TRUE(text.contains(QStringLiteral("   Device Pack:/kit/dp.xml")));
    EXPECT_TRUE(text.contains(QStringLiteral("args:") + raw + QStringLiteral("|") + logs
                              + QStringLiteral("/tempPPLogs|/cache/dp.dso|/sdk/pvs/platform\n")));
    EXPECT_TRUE(text.contains(QStringLiteral("cwd:") + QDir(perlCache).canonicalPath() + QStringLiteral("\n")));
    EXPECT_TRUE(text.contains(QStringLiteral("   Copying temporary post process files to log directory.")));
}

TEST_F(OatPostProcess, FrameworkPostProcessCoversTheWholeRawFolder)
{
    if (!testutil::HaveProgram(QStringLiteral("perl")))
        GTEST_SKIP() << "perl is not installed";
    env.remove(QStringLiteral("OatRawLogPath"));
    _OatFramework framework;
    framework.SetLogger(&log);
    framework.PostProcess(env);
    EXPECT_FALSE(env.contains(QStringLiteral("OatRawLogPath")));
    EXPECT_TRUE(QFileInfo::exists(logs + QStringLiteral("/timer-2026.oat.html")));
    // Reprocessing stamps nothing: the raw log is as it was.
    EXPECT_EQ(testutil::ReadFile(raw + QStringLiteral("/timer-2026.oat")), QByteArray("@Timer\nModuleVer: 1\n"));
}

struct MissingEntry {
    const char *key;
    const char *message;
};

class OatPostProcessMissing : public OatPostProcess, public ::testing::WithParamInterface<MissingEntry>
{
};

TEST_P(OatPostProcessMissing, StopsWithItsMessageAndKeepsTheRawLogs)
{
    if (!testutil::HaveProgram(QStringLiteral("perl")))
        GTEST_SKIP() << "perl is not installed";
    env.remove(QLatin1String(GetParam().key));
    module.PostProcess(env);
    EXPECT_TRUE(LogText().contains(QLatin1String(GetParam().message))) << LogText().toStdString();
    EXPECT_EQ(module.desktopLogFiles, QStringList{raw + QStringLiteral("/timer-2026.oat")});
    EXPECT_FALSE(LogText().contains(QStringLiteral("args:")));
    EXPECT_FALSE(QFileInfo::exists(logs + QStringLiteral("/tempPPLogs")));
}

INSTANTIATE_TEST_SUITE_P(
    Entries, OatPostProcessMissing,
    ::testing::Values(MissingEntry{"OatRawLogPath", "OatTestModule::PostProcess missing oat source log directory"},
                      MissingEntry{"LogPath", "OatTestModule::PostProcess missing destination log directory"},
                      MissingEntry{"DSOCacheFilePath", "OatTestModule::PostProcess missing devicePack file."},
                      MissingEntry{"Platform", "OatTestModule::PostProcess missing platform directory."}));

TEST_F(OatPostProcess, WithoutScriptOrPerlOnlyStamps)
{
    env.insert(QStringLiteral("PerlCache"), dir.filePath(QStringLiteral("nowhere")));
    module.PostProcess(env);
    EXPECT_TRUE(LogText().isEmpty());
    EXPECT_TRUE(testutil::ReadFile(raw + QStringLiteral("/timer-2026.oat")).contains("GUID:{r}"));

    env.insert(QStringLiteral("PerlCache"), perlCache);
    testutil::EnvGuard path("PATH", dir.filePath(QStringLiteral("empty")));
    module.PostProcess(env);
    EXPECT_TRUE(LogText().contains(QStringLiteral(" Post Processing Failed.  A Perl Instance can not be found.")));
}
