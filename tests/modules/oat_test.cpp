// OAT modules and the OAT framework: derived names, run options, the
// framework's data files and the Perl post-processing.

#include "moduletest.h"

#include "modules/oatframework.h"
#include "modules/oattestmodule.h"
#include "support/mockdevice.h"

#include <QDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

using namespace moduletest;
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

TEST(OatNames, DerivesHandsetNamesFromTheModuleName)
{
    // Module name, information file name; handset folder, information file, log base.
    const char *rows[][5] = {{"OatTimer", "", "oattimer", "oattimer.mif", "fs:/shared/pek/log/timer"},
                             {"Timer", "", "oattimer", "oattimer.mif", "fs:/shared/pek/log/timer"},
                             {"OATNet", "Net_Suite.mif", "oatnet", "Net_Suite.mif", "fs:/shared/pek/log/net"},
                             {"", "", "oat", "oat.mif", "fs:/shared/pek/log/"}};
    for (const auto &row : rows) {
        SCOPED_TRACE(row[0]);
        OatTestModule module;
        module.moduleName = QString::fromLatin1(row[0]);
        module.mifname = QString::fromLatin1(row[1]);
        EXPECT_EQ(module.HandsetDirectoryName(), QLatin1String(row[2]));
        EXPECT_EQ(module.MifFileName(), QLatin1String(row[3]));
        EXPECT_EQ(module.LogBasePath(), QLatin1String(row[4]));
    }
}

class OatRun : public moduletest::ModuleFolder
{
protected:
    void SetUp() override
    {
        module.SetLogger(&log);
        module.moduleName = u"OatTimer"_s;
        module.targets.insert(u"v"_s, Target(u"/oattimer.kestix"_s));
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
        EXPECT_CALL(device, StartApplet(0x01010001u, _)).WillOnce(DoAll(::testing::SaveArg<1>(&arguments), Return(0u)));
        EXPECT_TRUE(module.Run(&device, env));
        EXPECT_TRUE(module.runOption.isEmpty());
        return arguments;
    }

    OatTestModule module;
    NiceMock<MockDevice> device;
    QMap<QString, QString> env;
};

TEST_F(OatRun, ArgumentsNameTheModeTheProgramAndTheCases)
{
    module.programs << Program("OatSuite1");
    EXPECT_EQ(module.ModuleName(), u"OatSuite1"_s);
    EXPECT_EQ(ArgumentsFor(QString(), {}), u"-dk -ra OatSuite1"_s);
    EXPECT_EQ(ArgumentsFor(u"Automated"_s, {}), u"-dk -ru OatSuite1"_s);
    EXPECT_EQ(ArgumentsFor(u"inter"_s, {}), u"-dk -ri OatSuite1"_s);
    EXPECT_EQ(ArgumentsFor(u"ALL"_s, {}), u"-dk -ra OatSuite1"_s);
    EXPECT_EQ(ArgumentsFor(u"Interactive"_s, {u"t1"_s, u"t2"_s}), u"-dk -rs OatSuite1,t1,t2"_s);
    EXPECT_EQ(ArgumentsFor(u"Sometimes"_s, {}), u"-dk -ra OatSuite1"_s);
    EXPECT_TRUE(LogText().contains(u"OatTestModule::Unknown Run Optionsometimes"_s));
}

TEST_F(OatRun, WithoutAProgramNothingIsInstalledAndStartFailuresAreReported)
{
    module.SetRunOption(u"auto"_s);
    EXPECT_CALL(device, InstallPackage(_)).Times(0);
    EXPECT_FALSE(module.Run(&device, env));
    EXPECT_TRUE(module.runOption.isEmpty());

    ::testing::Mock::VerifyAndClearExpectations(&device);
    module.programs << Program("OatSuite1");
    device.lastError = 0x80004005u;
    EXPECT_CALL(device, StartApplet(_, _)).WillOnce(Return(1u));
    EXPECT_FALSE(module.Run(&device, env));
    EXPECT_TRUE(LogText().contains(u"OatTestModule::Run error: 2147500037(0x80004005)"_s));
}

TEST_F(OatRun, PrefersTheULog)
{
    EXPECT_CALL(device, FileExists(u"fs:/shared/pek/log/timer_u.oat"_s)).WillRepeatedly(Return(true));
    EXPECT_CALL(device, FileExists(u"fs:/shared/pek/log/timer.oat"_s)).Times(0);
    QStringList paths{u"stale"_s};
    ASSERT_TRUE(module.GetLogFilePaths(&device, paths));
    EXPECT_EQ(paths, QStringList{u"fs:/shared/pek/log/timer_u.oat"_s});
}

TEST_F(OatRun, FrameworkLoadPushesBothCachesAndRestoresTheFlags)
{
    _OatFramework framework;
    env = {{u"TestDataSpecified"_s, u"false"_s},
           {u"TestDataCachePath"_s, u"/cache/td.kar"_s},
           {u"DevicePackCachePath"_s, u"/cache/dp.kar"_s}};
    EXPECT_FALSE(framework.Load(&device, env));

    framework.variants.insert(u"v"_s, Target(u"/oat.kestix"_s));
    EXPECT_CALL(device, InstallPackage(u"/oat.kestix"_s)).WillOnce(Return(0u));
    EXPECT_CALL(device, FindModule(0x01010001u, _))
        .WillRepeatedly(DoAll(SetArgReferee<1>(u"fs:/usermods/oat/"_s), Return(0u)));
    EXPECT_CALL(device, CopyFileToDevice(u"/cache/td.kar"_s, u"fs:/usermods/oat/testdata.kar"_s));
    EXPECT_CALL(device, CopyFileToDevice(u"/cache/dp.kar"_s, u"fs:/usermods/oat/testdata2.kar"_s));
    ASSERT_TRUE(framework.Load(&device, env));
    EXPECT_FALSE(env.contains(u"KeyDevicePackSpecified"_s));
    EXPECT_EQ(env.value(u"TestDataSpecified"_s), u"false"_s);

    // A later PostLoad pushes only what its flags ask for.
    ::testing::Mock::VerifyAndClearExpectations(&device);
    env.insert(u"TestDataSpecified"_s, u"true"_s);
    env.remove(u"TestDataCachePath"_s);
    EXPECT_CALL(device, CopyFileToDevice(_, _)).Times(0);
    EXPECT_TRUE(framework.PostLoad(&device, env));
}

TEST_F(OatRun, FrameworkIsLoadedUsesTheFixedClassIdAndUnloadRemovesEveryOatFolder)
{
    _OatFramework framework;
    framework.classId = 5;
    EXPECT_CALL(device, FindModule(0x01010001u, _)).WillRepeatedly(Return(1u));
    EXPECT_CALL(device, ListDirectory(u"fs:/~0x01010001"_s, _)).WillOnce(ListingOf({u"fs:/~0x01010001/oat.mif"_s}));
    EXPECT_TRUE(framework.IsLoaded(&device));

    ::testing::InSequence order;
    EXPECT_CALL(device, RemoveDirectory(u"fs:/usermods/oat/"_s));
    EXPECT_CALL(device, RemoveDirectory(u"fs:/usermods/oatinterfaceext/"_s));
    EXPECT_CALL(device, RemoveDirectory(u"fs:/usermods/oatresourceext/"_s));
    framework.Unload(&device, env);
}

class OatPostProcess : public moduletest::ModuleFolder
{
protected:
    void SetUp() override
    {
        if (!testutil::HaveProgram(u"perl"_s))
            GTEST_SKIP() << "perl is not installed";
        perlCache = dir.filePath(u"perl"_s);
        logs = dir.filePath(u"logs"_s);
        raw = logs + u"/oatRawLogs"_s;
        testutil::WriteFile(perlCache + u"/PostProcess3.pl"_s, moduletest::kPostProcessScript);
        testutil::WriteFile(raw + u"/timer-2026.oat"_s, "@Timer\nModuleVer: 1\n");
        module.SetLogger(&log);
        module.moduleName = u"Timer"_s;
        module.AddDesktopLogFile(raw + u"/timer-2026.oat"_s);
        env = {{u"PerlCache"_s, perlCache},
               {u"TestRunID"_s, u"{r}"_s},
               {u"OatRawLogPath"_s, raw},
               {u"LogPath"_s, logs},
               {u"DevicePack"_s, u"/kit/dp.xml"_s},
               {u"DSOCacheFilePath"_s, u"/cache/dp.dso"_s},
               {u"Platform"_s, u"/sdk/pvs/platform"_s}};
    }
    QString perlCache, logs, raw;
    OatTestModule module;
    QMap<QString, QString> env;
};

TEST_F(OatPostProcess, RunsTheScriptAndCollectsItsOutput)
{
    module.PostProcess(env);

    const QString output = logs + u"/pp-timer-2026.oat"_s;
    EXPECT_EQ(module.desktopLogFiles, QStringList{output});
    EXPECT_EQ(testutil::ReadFile(output),
              QByteArray("processed with /cache/dp.dso on /sdk/pvs/platform\n@Timer\n"
                         "GUID:{r}\nManifest Name:Timer\nID Hash:\nModuleVer: 1\n\n"));
    EXPECT_FALSE(QFileInfo::exists(logs + u"/tempPPLogs"_s));
    const QString text = LogText();
    EXPECT_TRUE(text.contains(u"   Post Processing Oat"_s));
    EXPECT_TRUE(text.contains(u"   Device Pack:/kit/dp.xml"_s));
    EXPECT_TRUE(text.contains(u"args:"_s + raw + u"|"_s + logs + u"/tempPPLogs|/cache/dp.dso|/sdk/pvs/platform\n"_s));
    EXPECT_TRUE(text.contains(u"cwd:"_s + QDir(perlCache).canonicalPath() + u"\n"_s));
    EXPECT_TRUE(text.contains(u"   Copying temporary post process files to log directory."_s));
}

TEST_F(OatPostProcess, FrameworkPostProcessCoversTheWholeRawFolder)
{
    env.remove(u"OatRawLogPath"_s);
    _OatFramework framework;
    framework.SetLogger(&log);
    framework.PostProcess(env);
    EXPECT_FALSE(env.contains(u"OatRawLogPath"_s));
    EXPECT_TRUE(QFileInfo::exists(logs + u"/pp-timer-2026.oat"_s));
    // Reprocessing stamps nothing: the raw log is as it was.
    EXPECT_EQ(testutil::ReadFile(raw + u"/timer-2026.oat"_s), QByteArray("@Timer\nModuleVer: 1\n"));
}

TEST_F(OatPostProcess, MissingEntryStopsWithItsMessageAndKeepsTheRawLogs)
{
    const char *rows[][2] = {{"OatRawLogPath", "OatTestModule::PostProcess missing oat source log directory"},
                             {"LogPath", "OatTestModule::PostProcess missing destination log directory"},
                             {"DSOCacheFilePath", "OatTestModule::PostProcess missing devicePack file."},
                             {"Platform", "OatTestModule::PostProcess missing platform directory."}};
    for (const auto &[key, message] : rows) {
        QMap<QString, QString> partial = env;
        partial.remove(QLatin1String(key));
        module.PostProcess(partial);
        EXPECT_TRUE(LogText().contains(QLatin1String(message))) << LogText().toStdString();
        EXPECT_EQ(module.desktopLogFiles, QStringList{raw + u"/timer-2026.oat"_s});
    }
    EXPECT_FALSE(LogText().contains(u"args:"_s));
    EXPECT_FALSE(QFileInfo::exists(logs + u"/tempPPLogs"_s));
}

TEST_F(OatPostProcess, WithoutScriptOrPerlOnlyStamps)
{
    env.insert(u"PerlCache"_s, dir.filePath(u"nowhere"_s));
    module.PostProcess(env);
    EXPECT_TRUE(LogText().isEmpty());
    EXPECT_TRUE(testutil::ReadFile(raw + u"/timer-2026.oat"_s).contains("GUID:{r}"));

    env.insert(u"PerlCache"_s, perlCache);
    testutil::EnvGuard path("PATH", dir.filePath(u"empty"_s));
    module.PostProcess(env);
    EXPECT_TRUE(LogText().contains(u" Post Processing Failed.  A Perl Instance can not be found."_s));
}

} // namespace
