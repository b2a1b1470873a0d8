// Every module kind run on an emulated handset through the controller's order of calls: Run, IsLogComplete, CopyLog,
// RemoveTest, PostProcess, ParseLog. The packages are built here; their behaviour scripts write logs in the kind's
// format, as a real test would on a handset.

#include "moduletest.h"

#include "modules/ctfapplettestmodule.h"
#include "modules/ctftestmodule.h"
#include "modules/oatframework.h"
#include "modules/oattestmodule.h"
#include "modules/secondarymodule.h"
#include "modules/uttestmodule.h"
#include "support/kitrun.h"

#include <QDir>
#include <QDomDocument>
#include <QFileInfo>
#include <QRegularExpression>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

using namespace moduletest;

// The lines of a host file, without line ends.
QStringList Lines(const QString &path)
{
    return QString::fromUtf8(testutil::ReadFile(path)).split(u'\n');
}

class EndToEnd : public ::testing::Test
{
protected:
    void SetUp() override
    {
        run.AddHandset(u"phone"_s);
        device = fixture.Connect(u"phone"_s);
        ASSERT_TRUE(device);
        QDir().mkpath(logs);
        env = {{u"LogPath"_s, logs},
               {u"TestRunID"_s, u"{5f0c2f1e-0000-4000-8000-000000000001}"_s},
               {u"DataCachePath"_s, fixture.WorkFolder()}};
    }

    bool OnHandset(const QString &path) { return QFileInfo::exists(fixture.HostPath(u"phone"_s, path)); }

    // Runs the module through the controller's order of calls.
    void RunModule(_TestModule &module)
    {
        module.SetLogger(run.log());
        ASSERT_TRUE(module.Run(device.get(), env));
        ASSERT_TRUE(module.IsLogComplete(device.get()));
        ASSERT_TRUE(module.CopyLog(device.get(), env));
        module.RemoveTest(device.get());
        module.PostProcess(env);
    }

    // The verdicts of the module's copied logs, which must name manifestName and be complete.
    Pairs Verdicts(_TestModule &module, const QString &manifestName)
    {
        TestResults results;
        EXPECT_TRUE(module.ParseLog(results));
        EXPECT_EQ(results.manifestName, manifestName);
        EXPECT_TRUE(results.complete);
        return PairsOf(results);
    }

    testutil::KitRun run;
    testutil::HandsetFixture &fixture = run.Handsets();
    testutil::HandsetFixture::Device device;
    const QString logs = run.Path(u"logs"_s);
    QMap<QString, QString> env;
};

} // namespace

TEST_F(EndToEnd, CtfModuleRunsItsProgramAndLeavesNothingBehind)
{
    testutil::ModuleSpec layout;
    layout.directory = u"ITimer"_s;
    layout.programs = {{u"Helper"_s, QString(), 0x0102FAF7}, {u"ITimer_k_main"_s, u"-suite all"_s, 0x0102FAF7}};
    layout.behaviour = "log=usermods/CTF/CTF.log\n"
                       "[ -f \"$log\" ] || exit 3\n"
                       "{ echo \"Suite: ITimer\"; echo \"Args: $3 $4\"; echo \"Time: 2026/12/03 14:05:09\";\n"
                       "  echo \"Test: t1\"; echo \"Result: PASS\"; echo \"Result: Fail\"; echo \"Test: t2\";\n"
                       "  echo \"[/VERBOSE]\"; } >> \"$log\"\n";

    CtfTestModule module;
    module.moduleName = u"ITimer"_s;
    module.targets.insert(u"t"_s, Target(fixture.MakePackage(u"ITimer_Win32_Release.kestix"_s, layout)));
    EXPECT_FALSE(module.ProcessPackage(fixture.WorkFolder()));
    ASSERT_EQ(module.programs.size(), 2);
    EXPECT_EQ(module.ModuleName(), u"ITimer_k_main"_s);
    // A stale log from an earlier run is replaced by the empty template.
    testutil::WriteFile(fixture.HostPath(u"phone"_s, u"fs:/usermods/CTF/CTF.log"_s), "Suite: stale\n");
    RunModule(module);

    ASSERT_EQ(module.desktopLogFiles.size(), 1);
    const QStringList lines = Lines(module.desktopLogFiles.first());
    EXPECT_EQ(lines.first(), u"Suite: ITimer"_s);
    EXPECT_TRUE(lines.contains(u"Args: -suite all"_s));
    EXPECT_EQ(Verdicts(module, u"ITimer"_s), (Pairs{{"t1", "pass"}, {"t2", "fail"}}));
    EXPECT_FALSE(OnHandset(u"fs:/usermods/ITimer"_s));
    EXPECT_FALSE(OnHandset(u"fs:/usermods/CTF/CTF.log"_s));
}

TEST_F(EndToEnd, OatModuleRunsInTheFramework)
{
    // The framework applet runs the suite named in its arguments, once the
    // test data and the module's published information file are in place.
    testutil::ModuleSpec frameworkSpec;
    frameworkSpec.directory = u"oat"_s;
    frameworkSpec.appletIds = {0x01010001};
    frameworkSpec.behaviour = "[ -f usermods/oat/testdata.kar ] && [ -f mif/oattimer.mif ] || exit 5\n"
                              "mkdir -p shared/pek/log\n"
                              "{ echo \"@Timer\"; echo \"Args: $3 $4 $5\"; echo \"ModuleVer: 1.0\";\n"
                              "  echo \"@1: t1\"; echo \"Status: Success\"; echo \"@2: t2\"; echo \"@3: t3\";\n"
                              "  echo \"Status: Failed\"; echo \"RESULT: done\"; } > shared/pek/log/timer_u.oat\n";
    _OatFramework framework;
    framework.name = u"oat"_s;
    framework.variants.insert(u"oat"_s, Target(fixture.MakePackage(u"oat_Win32_Release.kestix"_s, frameworkSpec)));

    testutil::ModuleSpec layout;
    layout.directory = u"oattimer"_s;
    layout.classIds = {0x10002000};
    layout.suitePrograms = {u"Kesto:Timer:OatSuite1"_s};
    QDir().mkpath(fixture.WorkFolder() + u"/package"_s);
    const QString package = fixture.MakePackage(u"package/OatTimer_Win32_Release.kestix"_s, layout);

    OatTestModule module;
    module.moduleName = u"OatTimer"_s;
    module.ProcessPackage(fixture.WorkFolder() + u"/package"_s);
    EXPECT_EQ(module.mifname, u"oattimer.mif"_s);
    ASSERT_EQ(module.ModuleName(), u"OatSuite1"_s);
    module.classids << 0x10002000;
    module.targets.insert(u"t"_s, Target(package));
    module.SetTestCases({u"t1"_s, u"t3"_s});

    testutil::WriteFile(fixture.WorkFolder() + u"/td.kar"_s, "test data");
    env.insert(u"TestDataCachePath"_s, fixture.WorkFolder() + u"/td.kar"_s);
    ASSERT_FALSE(framework.IsLoaded(device.get()));
    ASSERT_TRUE(framework.Load(device.get(), env));
    ASSERT_TRUE(framework.IsLoaded(device.get()));
    RunModule(module);

    EXPECT_EQ(env.value(u"OatRawLogPath"_s), logs + u"/oatRawLogs"_s);
    ASSERT_EQ(module.desktopLogFiles.size(), 1);
    EXPECT_EQ(QFileInfo(module.desktopLogFiles.first()).absolutePath(), logs + u"/oatRawLogs"_s);
    EXPECT_TRUE(Lines(module.desktopLogFiles.first()).contains(u"Args: -dk -rs OatSuite1,t1,t3"_s));
    EXPECT_EQ(Verdicts(module, u"OatTimer"_s), (Pairs{{"t1", "pass"}, {"t2", "unexecuted"}, {"t3", "fail"}}));

    EXPECT_FALSE(OnHandset(u"fs:/usermods/oattimer"_s));
    EXPECT_FALSE(OnHandset(u"fs:/shared/pek/log/timer_u.oat"_s));
    EXPECT_FALSE(OnHandset(u"fs:/mif/oattimer.mif"_s));
    EXPECT_TRUE(OnHandset(u"fs:/usermods/oat/testdata.kar"_s));
    framework.Unload(device.get(), env);
    EXPECT_FALSE(OnHandset(u"fs:/usermods/oat"_s));
    EXPECT_FALSE(framework.IsLoaded(device.get()));
}

TEST_F(EndToEnd, UtModuleReadsItsConfigurationAndWritesBothLogs)
{
    testutil::ModuleSpec layout;
    layout.directory = u"uttimer"_s;
    layout.appletIds = {0x20002000};
    layout.behaviour
        = "allow=$(sed -n 's/^Allow=//p' mod/ututtimer/utconfig.dat)\n"
          "mkdir -p usermods/uttimer/log\n"
          "{ echo \"Unit test run\"; echo \"SuiteName: UTTimer 14:05:09 03-Dec-2026\";\n"
          "  echo \"------------\"; for t in $(echo $allow | tr , ' '); do echo \"$t PASSED 12 ms\"; done;\n"
          "  echo \"t9 Failed\"; echo \"------------\"; echo \"Elapsed Time: 1s\"; } > usermods/uttimer/log/run.txt\n"
          "echo '<TestRunLog cases=\"'$allow'\"></TestRunLog>' > usermods/uttimer/log/run.xml\n";
    const QString source = fixture.WorkFolder() + u"/src"_s;
    testutil::WriteFile(source + u"/utconfig.dat"_s, "[Defaults]\nLevel=2");

    UTTestModule module;
    module.moduleName = u"UTTimer"_s;
    module.sourcePath = source;
    module.applets << AppletWithId(0x20002000);
    module.targets.insert(u"t"_s, Target(fixture.MakePackage(u"UTTimer_Win32_Release.kestix"_s, layout)));
    module.SetTestCases({u"t1"_s, u"t2"_s});
    // The configuration's way to the handset leaves nothing behind.
    const QStringList before = QDir::temp().entryList({u"test_*.dat"_s}, QDir::Files);
    RunModule(module);
    EXPECT_EQ(QDir::temp().entryList({u"test_*.dat"_s}, QDir::Files), before);

    EXPECT_EQ(
        testutil::ReadFile(fixture.HostPath(u"phone"_s, u"fs:/mod/ututtimer/utconfig.dat"_s)),
        QByteArray(
            "[Defaults]\nLevel=2\n[TestFramework]\nSkipIfNoGolden=1\nLogSkippedGoldens=0\nSkipKnown=1\nAllow=t1,t2\n"));
    // Both logs are copied; stamped with the run, the XML log stays well-formed.
    ASSERT_EQ(module.desktopLogFiles.filter(QRegularExpression(u"\\.(txt|xml)$"_s)).size(), 2);
    testutil::ExpectXmllintAccepts(module.desktopLogFiles.filter(u".xml"_s).value(0));

    EXPECT_EQ(Verdicts(module, u"Timer"_s), (Pairs{{"t1", "pass"}, {"t2", "pass"}}));
    EXPECT_FALSE(OnHandset(u"fs:/usermods/uttimer"_s));
}

TEST_F(EndToEnd, SecondaryModulesAreInstalledAndRemovedWithTheirUser)
{
    testutil::ModuleSpec helperSpec;
    helperSpec.directory = u"helper"_s;
    helperSpec.files = {{u"data.bin"_s, "x"}};
    SecondaryModule helper;
    helper.moduleName = u"helper"_s;
    helper.targets.insert(u"t"_s, Target(fixture.MakePackage(u"helper_Win32_Release.kestix"_s, helperSpec)));
    ASSERT_TRUE(helper.InstallTest(device.get()));
    EXPECT_TRUE(OnHandset(u"fs:/usermods/helper/data.bin"_s));

    testutil::ModuleSpec layout;
    layout.directory = u"user"_s;
    layout.appletIds = {0x30003000};
    CtfAppletTestModule user;
    user.moduleName = u"user"_s;
    user.applets << AppletWithId(0x30003000);
    user.secondaryModules << u"helper"_s;
    user.targets.insert(u"t"_s, Target(fixture.MakePackage(u"user_Win32_Release.kestix"_s, layout)));
    ASSERT_TRUE(user.InstallTest(device.get()));
    EXPECT_EQ(user.deviceDirectory, u"fs:/usermods/user/"_s);
    EXPECT_TRUE(user.RemoveTest(device.get()));
    EXPECT_FALSE(OnHandset(u"fs:/usermods/user"_s));
    EXPECT_FALSE(OnHandset(u"fs:/usermods/helper"_s));
}

TEST_F(EndToEnd, PackagesAreFoundUnderEveryNameTheKitUses)
{
    // A CTF package named with the "ctf" prefix, holding another module's information file first.
    testutil::ModuleSpec other;
    other.directory = u"other"_s;
    other.programs = {{u"Other_k"_s, QString(), 0x0102FAF7}};
    testutil::ModuleSpec layout;
    layout.directory = u"ITimer"_s;
    layout.mifName = u"itimer.MIF"_s;
    layout.programs = {{u"ITimer_k"_s, u"-a"_s, 0x0102FAF7}, {u"NotAProgram"_s, QString(), 0x0102C305}};
    testutil::Members members = testutil::ModuleMembers(other) + testutil::ModuleMembers(layout);
    const QString folder = fixture.WorkFolder() + u"/package"_s;
    QDir().mkpath(folder);
    fixture.MakePackage(u"package/ctfITimerRVCT22arm9_Release.kestix"_s, members);

    CtfTestModule ctf;
    ctf.moduleName = u"ITimer"_s;
    EXPECT_FALSE(ctf.ProcessPackage(folder));
    ASSERT_EQ(ctf.programs.size(), 1);
    EXPECT_EQ(ctf.ModuleName(), u"ITimer_k"_s);

    CtfTestModule missing;
    missing.moduleName = u"Absent"_s;
    EXPECT_FALSE(missing.ProcessPackage(folder));
    EXPECT_TRUE(missing.programs.isEmpty());

    // An OAT package takes the name of its information file and the suite program records only.
    testutil::ModuleSpec oatSpec;
    oatSpec.directory = u"oat/suites"_s;
    oatSpec.mifName = u"suites_oatnet.mif"_s;
    oatSpec.suitePrograms = {u"Kesto:Net:NetSuite"_s, u"two:parts"_s};
    oatSpec.programs = {{u"OatNet_k"_s, QString(), 0x0102FAF7}};
    fixture.MakePackage(u"package/oatOatNet_Win32_Debug.kestix"_s, oatSpec);
    OatTestModule oat;
    oat.moduleName = u"OatNet"_s;
    EXPECT_FALSE(oat.ProcessPackage(folder));
    EXPECT_EQ(oat.mifname, u"suites_oatnet.mif"_s);
    ASSERT_EQ(oat.programs.size(), 2);
    EXPECT_EQ(oat.ModuleName(), u"NetSuite"_s);

    QDomDocument document;
    QDomElement entry = document.createElement(u"testmodule"_s);
    oat.WriteToManifest(entry);
    OatTestModule back;
    EXPECT_TRUE(back.ReadFromManifest(entry));
    EXPECT_EQ(back.mifname, oat.mifname);
    EXPECT_EQ(back.ModuleName(), u"NetSuite"_s);
    OatTestModule none;
    entry.removeChild(entry.firstChildElement(u"programs"_s));
    EXPECT_FALSE(none.ReadFromManifest(entry));
}
