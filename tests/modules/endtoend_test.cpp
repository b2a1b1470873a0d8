// Every module kind run on an emulated handset through the controller's
// order of calls: Run, IsLogComplete, CopyLog, RemoveTest, PostProcess,
// ParseLog. The packages are built here; their behaviour scripts write logs
// in the kind's format, as a real test would on a handset.

#include "moduletest.h"

#include "log/log.h"
#include "modules/ctfapplettestmodule.h"
#include "modules/ctftestmodule.h"
#include "modules/oatframework.h"
#include "modules/oattestmodule.h"
#include "modules/secondarymodule.h"
#include "modules/uttestmodule.h"
#include "support/handsetfixture.h"
#include "support/testutil.h"

#include <QDir>
#include <QDomDocument>
#include <QFileInfo>
#include <QRegularExpression>

#include <gtest/gtest.h>

namespace {

using moduletest::AppletWithId;
using moduletest::Pairs;
using moduletest::PairsOf;
using moduletest::Target;

// The lines of a host file, without line ends.
QStringList Lines(const QString &path)
{
    return QString::fromUtf8(testutil::ReadFile(path)).split(QLatin1Char('\n'));
}

class EndToEnd : public ::testing::Test
{
protected:
    void SetUp() override
    {
        fixture.AddHandset(QStringLiteral("phone"), QStringLiteral("Test phone"), QStringLiteral("win32"));
        device = fixture.Connect(QStringLiteral("phone"));
        ASSERT_TRUE(device);
        logs = fixture.WorkFolder() + QStringLiteral("/logs");
        QDir().mkpath(logs);
        log.SetLogPath(fixture.WorkFolder() + QStringLiteral("/log.txt"));
        env = {{QStringLiteral("LogPath"), logs},
               {QStringLiteral("TestRunID"), QStringLiteral("{5f0c2f1e-0000-4000-8000-000000000001}")},
               {QStringLiteral("DataCachePath"), fixture.WorkFolder()}};
    }

    bool OnHandset(const QString &path) { return QFileInfo::exists(fixture.HostPath(QStringLiteral("phone"), path)); }

    // Runs the module through the controller's order of calls.
    void RunModule(_TestModule &module)
    {
        module.SetLogger(&log);
        ASSERT_TRUE(module.Run(device.get(), env));
        ASSERT_TRUE(module.IsLogComplete(device.get()));
        ASSERT_TRUE(module.CopyLog(device.get(), env));
        module.RemoveTest(device.get());
        module.PostProcess(env);
    }

    // The header lines stamped before the anchor at index anchor.
    void ExpectHeaderBefore(const QStringList &lines, const QString &anchor, _TestModule &module)
    {
        const qsizetype at = lines.indexOf(anchor);
        ASSERT_GE(at, 3) << lines.join(QLatin1Char('\n')).toStdString();
        EXPECT_EQ(lines.at(at - 3), QStringLiteral("GUID:") + env.value(QStringLiteral("TestRunID")));
        EXPECT_EQ(lines.at(at - 2), QStringLiteral("Manifest Name:") + module.moduleName);
        EXPECT_EQ(lines.at(at - 1), QStringLiteral("ID Hash:") + module.IDHash());
    }

    testutil::HandsetFixture fixture;
    testutil::HandsetFixture::Device device;
    QString logs;
    Log log;
    QMap<QString, QString> env;
};

const QString kStamp = QStringLiteral("-\\d{4}-\\d\\d-\\d\\d-\\d\\d-\\d\\d-\\d\\d\\.");

} // namespace

TEST_F(EndToEnd, CtfModuleRunsItsProgramAndLeavesNothingBehind)
{
    testutil::ModuleSpec layout;
    layout.directory = QStringLiteral("ITimer");
    layout.programs = {{QStringLiteral("Helper"), QString(), 0x0102FAF7},
                     {QStringLiteral("ITimer_k_main"), QStringLiteral("-suite all"), 0x0102FAF7}};
    layout.behaviour = "log=usermods/CTF/CTF.log\n"
                     "[ -f \"$log\" ] || exit 3\n"
                     "{ echo \"Suite: ITimer\"; echo \"Args: $3 $4\"; echo \"Time: 2026/12/03 14:05:09\";\n"
                     "  echo \"Test: t1\"; echo \"Result: PASS\"; echo \"Result: Fail\"; echo \"Test: t2\";\n"
                     "  echo \"[/VERBOSE]\"; } >> \"$log\"\n";
    const QString package = fixture.MakePackage(QStringLiteral("ITimer_Win32_Release.kestix"), layout);

    CtfTestModule module;
    module.moduleName = QStringLiteral("ITimer");
    module.source = QStringLiteral("KVK");
    ASSERT_TRUE(module.ProcessPackage(QFileInfo(package).absolutePath()) == false);
    ASSERT_EQ(module.programs.size(), 2);
    EXPECT_EQ(module.ModuleName(), QStringLiteral("ITimer_k_main"));
    module.targets.insert(QStringLiteral("t"), Target(package));
    QDomDocument document;
    QDomElement entry = document.createElement(QStringLiteral("testmodule"));
    module.WriteToManifest(entry); // computes the ID hash

    // A stale log from an earlier run is replaced by the empty template.
    testutil::WriteFile(fixture.HostPath(QStringLiteral("phone"), QStringLiteral("fs:/usermods/CTF/CTF.log")),
                        "Suite: stale\n");
    RunModule(module);

    ASSERT_EQ(module.desktopLogFiles.size(), 1);
    const QString copied = module.desktopLogFiles.first();
    EXPECT_TRUE(QFileInfo(copied).fileName().contains(QRegularExpression(QStringLiteral("^ITimer-CTF") + kStamp + QStringLiteral("log$"))));
    const QStringList lines = Lines(copied);
    EXPECT_EQ(lines.first(), QStringLiteral("Suite: ITimer"));
    EXPECT_TRUE(lines.contains(QStringLiteral("Args: -suite all")));
    ExpectHeaderBefore(lines, QStringLiteral("Test: t1"), module);

    TestResults results;
    ASSERT_TRUE(module.ParseLog(results));
    EXPECT_EQ(results.manifestName, QStringLiteral("ITimer"));
    EXPECT_EQ(results.idHash, module.IDHash());
    EXPECT_TRUE(results.complete);
    EXPECT_EQ(PairsOf(results), (Pairs{{"t1", "pass"}, {"t2", "fail"}}));

    EXPECT_FALSE(OnHandset(QStringLiteral("fs:/usermods/ITimer")));
    EXPECT_FALSE(OnHandset(QStringLiteral("fs:/usermods/CTF/CTF.log")));

    // The programs survive the manifest.
    CtfTestModule back;
    EXPECT_TRUE(back.ReadFromManifest(entry));
    EXPECT_EQ(back.ModuleName(), QStringLiteral("ITimer_k_main"));
}

TEST_F(EndToEnd, CtfAppletModuleRunsByClassId)
{
    testutil::ModuleSpec layout;
    layout.directory = QStringLiteral("suite");
    layout.appletIds = {0x10001000};
    layout.behaviour = "[ \"$1 $2\" = \"applet 0x10001000\" ] || exit 4\n"
                     "{ echo \"Suite: Suite_k\"; echo \"Test: t1 with words\"; echo \"Result: Pass\";\n"
                     "  echo \"[/VERBOSE]\"; } > usermods/suite/suite_k.log\n"
                     "echo notes > usermods/suite/notes.txt\n";
    const QString package = fixture.MakePackage(QStringLiteral("Suite_Win32_Release.kestix"), layout);

    CtfAppletTestModule module;
    module.moduleName = QStringLiteral("Suite");
    module.applets << AppletWithId(0x10001000);
    module.targets.insert(QStringLiteral("t"), Target(package));
    EXPECT_EQ(module.ModuleName(), QStringLiteral("0X10001000"));
    RunModule(module);

    ASSERT_EQ(module.desktopLogFiles.size(), 1);
    EXPECT_TRUE(QFileInfo(module.desktopLogFiles[0]).fileName().contains(QRegularExpression(QStringLiteral("^suite") + kStamp + QStringLiteral("log$"))));
    ExpectHeaderBefore(Lines(module.desktopLogFiles[0]), QStringLiteral("Test: t1 with words"), module);
    TestResults results;
    ASSERT_TRUE(module.ParseLog(results));
    EXPECT_EQ(results.manifestName, QStringLiteral("Suite"));
    EXPECT_EQ(PairsOf(results), (Pairs{{"t1", "pass"}}));
    EXPECT_FALSE(OnHandset(QStringLiteral("fs:/usermods/suite")));
}

TEST_F(EndToEnd, OatModuleRunsInTheFrameworkAndIsPostProcessed)
{
    if (!testutil::HaveProgram(QStringLiteral("perl")))
        GTEST_SKIP() << "perl is not installed";

    // The framework applet runs the suite named in its arguments.
    testutil::ModuleSpec frameworkSpec;
    frameworkSpec.directory = QStringLiteral("oat");
    frameworkSpec.appletIds = {0x01010001};
    frameworkSpec.behaviour = "[ -f usermods/oat/testdata.kar ] || exit 5\n"
                              "mkdir -p shared/pek/log\n"
                              "{ echo \"@Timer\"; echo \"Args: $3 $4 $5\"; echo \"ModuleVer: 1.0\";\n"
                              "  echo \"@1: t1\"; echo \"Status: Success\"; echo \"@2: t2\"; echo \"@3: t3\";\n"
                              "  echo \"Status: Failed\"; echo \"RESULT: done\"; } > shared/pek/log/timer_u.oat\n";
    _OatFramework framework;
    framework.name = QStringLiteral("oat");
    framework.variants.insert(QStringLiteral("oat"),
                              Target(fixture.MakePackage(QStringLiteral("oat_Win32_Release.kestix"), frameworkSpec)));

    testutil::ModuleSpec layout;
    layout.directory = QStringLiteral("oattimer");
    layout.classIds = {0x10002000};
    layout.suitePrograms = {QStringLiteral("Kesto:Timer:OatSuite1")};
    QDir().mkpath(fixture.WorkFolder() + QStringLiteral("/package"));
    const QString package = fixture.MakePackage(QStringLiteral("package/OatTimer_Win32_Release.kestix"), layout);

    OatTestModule module;
    module.moduleName = QStringLiteral("OatTimer");
    module.ProcessPackage(QFileInfo(package).absolutePath());
    EXPECT_EQ(module.mifname, QStringLiteral("oattimer.mif"));
    ASSERT_EQ(module.ModuleName(), QStringLiteral("OatSuite1"));
    module.classids << 0x10002000;
    module.targets.insert(QStringLiteral("t"), Target(package));
    module.SetTestCases({QStringLiteral("t1"), QStringLiteral("t3")});

    testutil::WriteFile(fixture.WorkFolder() + QStringLiteral("/td.kar"), "test data");
    env.insert(QStringLiteral("TestDataCachePath"), fixture.WorkFolder() + QStringLiteral("/td.kar"));
    ASSERT_FALSE(framework.IsLoaded(device.get()));
    ASSERT_TRUE(framework.Load(device.get(), env));
    ASSERT_TRUE(framework.IsLoaded(device.get()));

    const QString perlCache = fixture.WorkFolder() + QStringLiteral("/perl");
    testutil::WriteFile(perlCache + QStringLiteral("/PostProcess3.pl"),
                        "my ($source, $temp) = @ARGV;\n"
                        "opendir(my $dh, $source) or die;\n"
                        "for my $n (grep { /\\.oat$/ } readdir($dh)) {\n"
                        "  open(my $i, '<', \"$source/$n\") or die; open(my $o, '>', \"$temp/pp-$n\") or die;\n"
                        "  print {$o} <$i>; print \"processed $n\\n\";\n"
                        "}\n");
    env.insert(QStringLiteral("PerlCache"), perlCache);
    env.insert(QStringLiteral("DevicePack"), QStringLiteral("/kit/deviceref.dso"));
    env.insert(QStringLiteral("DSOCacheFilePath"), QStringLiteral("/cache/dso"));
    env.insert(QStringLiteral("Platform"), QStringLiteral("/sdk/pvs/platform"));

    module.SetLogger(&log);
    ASSERT_TRUE(module.Run(device.get(), env));
    EXPECT_TRUE(OnHandset(QStringLiteral("fs:/mif/oattimer.mif")));
    ASSERT_TRUE(module.IsLogComplete(device.get()));
    ASSERT_TRUE(module.CopyLog(device.get(), env));
    EXPECT_EQ(env.value(QStringLiteral("OatRawLogPath")), logs + QStringLiteral("/oatRawLogs"));
    ASSERT_EQ(module.desktopLogFiles.size(), 1);
    const QString raw = module.desktopLogFiles.first();
    EXPECT_TRUE(QFileInfo(raw).fileName().contains(QRegularExpression(QStringLiteral("^timer_u") + kStamp + QStringLiteral("oat$"))));
    module.RemoveTest(device.get());
    module.PostProcess(env);

    ExpectHeaderBefore(Lines(raw), QStringLiteral("ModuleVer: 1.0"), module);
    EXPECT_TRUE(Lines(raw).contains(QStringLiteral("Args: -dk -rs OatSuite1,t1,t3")));
    ASSERT_EQ(module.desktopLogFiles.size(), 1);
    EXPECT_EQ(QFileInfo(module.desktopLogFiles[0]).absolutePath(), logs);
    EXPECT_TRUE(QFileInfo(module.desktopLogFiles[0]).fileName().startsWith(QStringLiteral("pp-timer_u")));
    EXPECT_TRUE(testutil::ReadFile(fixture.WorkFolder() + QStringLiteral("/log.txt")).contains("processed timer_u"));

    TestResults results;
    ASSERT_TRUE(module.ParseLog(results));
    EXPECT_EQ(results.manifestName, QStringLiteral("OatTimer"));
    EXPECT_TRUE(results.complete);
    EXPECT_EQ(PairsOf(results), (Pairs{{"t1", "pass"}, {"t2", "unexecuted"}, {"t3", "fail"}}));

    EXPECT_FALSE(OnHandset(QStringLiteral("fs:/usermods/oattimer")));
    EXPECT_FALSE(OnHandset(QStringLiteral("fs:/shared/pek/log/timer_u.oat")));
    EXPECT_FALSE(OnHandset(QStringLiteral("fs:/mif/oattimer.mif")));
    EXPECT_TRUE(OnHandset(QStringLiteral("fs:/usermods/oat/testdata.kar")));
    framework.Unload(device.get(), env);
    EXPECT_FALSE(OnHandset(QStringLiteral("fs:/usermods/oat")));
    EXPECT_FALSE(framework.IsLoaded(device.get()));
}

TEST_F(EndToEnd, UtModuleReadsItsConfigurationAndWritesBothLogs)
{
    testutil::ModuleSpec layout;
    layout.directory = QStringLiteral("uttimer");
    layout.appletIds = {0x20002000};
    layout.behaviour = "allow=$(sed -n 's/^Allow=//p' mod/ututtimer/utconfig.dat)\n"
                     "mkdir -p usermods/uttimer/log\n"
                     "{ echo \"Unit test run\"; echo \"SuiteName: UTTimer 14:05:09 03-Dec-2026\";\n"
                     "  echo \"------------\"; for t in $(echo $allow | tr , ' '); do echo \"$t PASSED 12 ms\"; done;\n"
                     "  echo \"t9 Failed\"; echo \"------------\"; echo \"Elapsed Time: 1s\"; } > usermods/uttimer/log/run.txt\n"
                     "echo '<TestRunLog cases=\"'$allow'\"></TestRunLog>' > usermods/uttimer/log/run.xml\n";
    const QString package = fixture.MakePackage(QStringLiteral("UTTimer_Win32_Release.kestix"), layout);
    const QString source = fixture.WorkFolder() + QStringLiteral("/src");
    testutil::WriteFile(source + QStringLiteral("/utconfig.dat"), "[Defaults]\nLevel=2");

    UTTestModule module;
    module.moduleName = QStringLiteral("UTTimer");
    module.sourcePath = source;
    module.applets << AppletWithId(0x20002000);
    module.targets.insert(QStringLiteral("t"), Target(package));
    module.SetTestCases({QStringLiteral("t1"), QStringLiteral("t2")});
    const auto scratch = [] { return QDir::temp().entryList({QStringLiteral("test_*.dat")}, QDir::Files); };
    const QStringList before = scratch();
    RunModule(module);
    EXPECT_EQ(scratch(), before);  // the configuration's way to the handset leaves nothing behind

    EXPECT_EQ(testutil::ReadFile(fixture.HostPath(QStringLiteral("phone"), QStringLiteral("fs:/mod/ututtimer/utconfig.dat"))),
              QByteArray("[Defaults]\nLevel=2\n[TestFramework]\nSkipIfNoGolden=1\nLogSkippedGoldens=0\nSkipKnown=1\nAllow=t1,t2\n"));
    ASSERT_EQ(module.desktopLogFiles.size(), 2);
    QString text;
    QString xml;
    for (const QString &path : std::as_const(module.desktopLogFiles))
        (path.endsWith(QLatin1String(".txt")) ? text : xml) = path;
    ASSERT_FALSE(text.isEmpty());
    ASSERT_FALSE(xml.isEmpty());
    const QStringList lines = Lines(text);
    EXPECT_EQ(lines.at(0), QStringLiteral("Unit test run"));
    ExpectHeaderBefore(lines, QStringLiteral("SuiteName: UTTimer 14:05:09 03-Dec-2026"), module);

    QDomDocument document;
    ASSERT_TRUE(document.setContent(testutil::ReadFile(xml)));
    EXPECT_EQ(document.documentElement().attribute(QStringLiteral("guid")), env.value(QStringLiteral("TestRunID")));
    EXPECT_EQ(document.documentElement().attribute(QStringLiteral("manifest_name")), QStringLiteral("UTTimer"));
    EXPECT_EQ(document.documentElement().attribute(QStringLiteral("cases")), QStringLiteral("t1,t2"));
    if (testutil::HaveProgram(QStringLiteral("xmllint"))) {
        EXPECT_EQ(testutil::RunProgram(QStringLiteral("xmllint"), {QStringLiteral("--noout"), xml}), 0);
    }

    TestResults results;
    ASSERT_TRUE(module.ParseLog(results));
    EXPECT_EQ(results.manifestName, QStringLiteral("Timer"));
    EXPECT_TRUE(results.complete);
    EXPECT_EQ(results.timeStamp, QDateTime(QDate(2026, 12, 3), QTime(14, 5, 9)));
    EXPECT_EQ(PairsOf(results), (Pairs{{"t1", "pass"}, {"t2", "pass"}}));
    EXPECT_FALSE(OnHandset(QStringLiteral("fs:/usermods/uttimer")));
}

TEST_F(EndToEnd, SecondaryModulesAreInstalledAndRemovedWithTheirUser)
{
    testutil::ModuleSpec helperSpec;
    helperSpec.directory = QStringLiteral("helper");
    helperSpec.files = {{QStringLiteral("data.bin"), "x"}};
    SecondaryModule helper;
    helper.moduleName = QStringLiteral("helper");
    helper.targets.insert(QStringLiteral("t"), Target(fixture.MakePackage(QStringLiteral("helper_Win32_Release.kestix"), helperSpec)));
    ASSERT_TRUE(helper.InstallTest(device.get()));
    EXPECT_TRUE(OnHandset(QStringLiteral("fs:/usermods/helper/data.bin")));
    EXPECT_FALSE(helper.Run(device.get(), env));

    testutil::ModuleSpec layout;
    layout.directory = QStringLiteral("user");
    layout.appletIds = {0x30003000};
    CtfAppletTestModule user;
    user.moduleName = QStringLiteral("user");
    user.applets << AppletWithId(0x30003000);
    user.secondaryModules << QStringLiteral("helper");
    user.targets.insert(QStringLiteral("t"), Target(fixture.MakePackage(QStringLiteral("user_Win32_Release.kestix"), layout)));
    ASSERT_TRUE(user.InstallTest(device.get()));
    EXPECT_EQ(user.deviceDirectory, QStringLiteral("fs:/usermods/user/"));
    EXPECT_TRUE(user.RemoveTest(device.get()));
    EXPECT_FALSE(OnHandset(QStringLiteral("fs:/usermods/user")));
    EXPECT_FALSE(OnHandset(QStringLiteral("fs:/usermods/helper")));
}

TEST_F(EndToEnd, PackagesAreFoundUnderEveryNameTheKitUses)
{
    // A CTF package named with the "ctf" prefix, holding another module's
    // information file first.
    testutil::ModuleSpec other;
    other.directory = QStringLiteral("other");
    other.programs = {{QStringLiteral("Other_k"), QString(), 0x0102FAF7}};
    testutil::ModuleSpec layout;
    layout.directory = QStringLiteral("ITimer");
    layout.mifName = QStringLiteral("itimer.MIF");
    layout.programs = {{QStringLiteral("ITimer_k"), QStringLiteral("-a"), 0x0102FAF7},
                     {QStringLiteral("NotAProgram"), QString(), 0x0102C305}};
    testutil::Members members = testutil::ModuleMembers(other) + testutil::ModuleMembers(layout);
    const QString folder = fixture.WorkFolder() + QStringLiteral("/package");
    QDir().mkpath(folder);
    fixture.MakePackage(QStringLiteral("package/ctfITimerRVCT22arm9_Release.kestix"), members);

    CtfTestModule ctf;
    ctf.moduleName = QStringLiteral("ITimer");
    EXPECT_FALSE(ctf.ProcessPackage(folder));
    ASSERT_EQ(ctf.programs.size(), 1);
    EXPECT_EQ(ctf.ModuleName(), QStringLiteral("ITimer_k"));

    CtfTestModule missing;
    missing.moduleName = QStringLiteral("Absent");
    EXPECT_FALSE(missing.ProcessPackage(folder));
    EXPECT_TRUE(missing.programs.isEmpty());

    // An OAT package takes the name of its information file and the suite
    // program records only.
    testutil::ModuleSpec oatSpec;
    oatSpec.directory = QStringLiteral("oat/suites");
    oatSpec.mifName = QStringLiteral("suites_oatnet.mif");
    oatSpec.suitePrograms = {QStringLiteral("Kesto:Net:NetSuite"), QStringLiteral("two:parts")};
    oatSpec.programs = {{QStringLiteral("OatNet_k"), QString(), 0x0102FAF7}};
    fixture.MakePackage(QStringLiteral("package/oatOatNet_Win32_Debug.kestix"), oatSpec);
    OatTestModule oat;
    oat.moduleName = QStringLiteral("OatNet");
    EXPECT_FALSE(oat.ProcessPackage(folder));
    EXPECT_EQ(oat.mifname, QStringLiteral("suites_oatnet.mif"));
    ASSERT_EQ(oat.programs.size(), 2);
    EXPECT_EQ(oat.ModuleName(), QStringLiteral("NetSuite"));

    QDomDocument document;
    QDomElement entry = document.createElement(QStringLiteral("testmodule"));
    oat.WriteToManifest(entry);
    OatTestModule back;
    EXPECT_TRUE(back.ReadFromManifest(entry));
    EXPECT_EQ(back.mifname, oat.mifname);
    EXPECT_EQ(back.ModuleName(), QStringLiteral("NetSuite"));
    OatTestModule none;
    entry.removeChild(entry.firstChildElement(QStringLiteral("programs")));
    EXPECT_FALSE(none.ReadFromManifest(entry));
}
