// Whole runs on the emulated handset: kits built at test time with every
// module kind, scanned into catalogues, installed, started, their logs
// copied, post-processed and recorded.

#include "controllertest.h"

#include "environment/testdirectories.h"
#include "support/handsetfixture.h"
#include "support/kitbuilder.h"

#include <QDir>
#include <QDirIterator>

namespace {

using controllertest::ReadResults;
using controllertest::ResultsView;
using harnesstest::CapturedLog;
using testutil::EnvGuard;
using testutil::ModuleSpec;
using testutil::WriteFile;

constexpr unsigned int kOatApplet = 0x01010001;
constexpr unsigned int kOatFrameworkClass = 0x0107556B;
constexpr unsigned int kBrowserApplet = 0x01230002;
constexpr unsigned int kMenuApplet = 0x01230003;
constexpr unsigned int kKeyedProgram = 0x01010100;

// CTF "Audio": writes the shared CTF log; its case "helper" passes only
// when its secondary module is installed.
const char kAudioBehaviour[] = R"SH(
mkdir -p usermods/CTF
helper=Fail
[ -d usermods/Helper ] && helper=Pass
printf 'Suite: Audio\nTest: play\nResult: Pass\nTest: helper\nResult: %s\nTest: record.1\nResult: Fail\n[/VERBOSE]\n' "$helper" > usermods/CTF/CTF.log
)SH";

// CTF applet "Browser": a log in its own module folder.
const char kBrowserBehaviour[] = R"SH(
printf 'Suite: Browser\nTest: open page\nResult: Pass\nTest: close\nResult: Unsupported\n[/VERBOSE]\n' > "$HANDSET_MODULE_DIR/browser_k.log"
)SH";

// UT "Menu": a text and an XML log in the module's log folder.
const char kMenuBehaviour[] = R"SH(
mkdir -p "$HANDSET_MODULE_DIR/log"
printf 'SuiteName: UTMenu 10:00:00 03-Dec-2026\nCase Result Time Note\n----\nopen PASS 1 ok\nscroll FAIL 2 bad\n----\nElapsed Time: 3\n' > "$HANDSET_MODULE_DIR/log/menu.txt"
printf '<TestRunLog><case name="open"/></TestRunLog>\n' > "$HANDSET_MODULE_DIR/log/menu.xml"
)SH";

// The OAT framework applet: runs the OAT program named in its arguments
// ("-dk -ra Name" or "-dk -rs Name,case,..."), writing "<name>.oat". With
// "go-offline" beside the handset it takes the handset offline instead.
const char kOatBehaviour[] = R"SH(
[ -f "$HANDSET_FS/../go-offline" ] && { : > "$HANDSET_FS/../offline"; exit 0; }
shift 2
echo "$@" >> "$HANDSET_FS/../oat-calls.txt"
program=$(echo "$3" | cut -d, -f1)
name=$(echo "$program" | tr 'A-Z' 'a-z')
mkdir -p shared/pek/log
printf '@%s\nModuleVer: 1\n@1: %s_first\nStatus: success\n@2: %s_second\nStatus: failed\nRESULT: done\n' "$program" "$program" "$program" > "shared/pek/log/$name.oat"
)SH";

// The OAT post-processing script: copies every raw log into the temporary
// folder with one more passed case, and removes the raw log.
const char kPerlScript[] = R"PL(
use strict;
my ($source, $temp, $pack, $platform) = @ARGV;
opendir(my $dir, $source) or die "no $source";
for my $name (readdir($dir)) {
    next unless $name =~ /\.oat$/;
    open(my $in, '<', "$source/$name") or die;
    local $/; my $text = <$in>; close($in);
    open(my $out, '>', "$temp/$name") or die;
    print $out $text . "\@9: perl_checked\nStatus: success\n";
    close($out);
    unlink("$source/$name");
}
print "post-processed with $pack\n";
)PL";

kitbuilder::Module MakeModule(const QString &kind, const QString &name, const QStringList &cases)
{
    kitbuilder::Module module;
    module.kind = kind;
    module.name = name;
    module.family = QStringLiteral("family-") + name.toLower();
    module.testCases = cases;
    module.variants = {QStringLiteral("Win32_Debug")};
    module.package.directory = name;
    return module;
}

class HandsetRunTest : public ::testing::Test
{
protected:
    HandsetRunTest()
        : m_env("KESTIX_DATA_ROOT", m_dir.filePath(QStringLiteral("data"))),
          m_kit(m_dir.filePath(QStringLiteral("kit"))),
          m_platform(m_dir.filePath(QStringLiteral("platform/pvs/platform")))
    {
    }

    void SetUp() override
    {
        ASSERT_TRUE(m_dir.isValid());
        BuildKit();
        ASSERT_TRUE(m_kit.Ok()) << m_kit.Errors().join(QLatin1Char('\n')).toStdString();
        ASSERT_TRUE(m_platform.Ok()) << m_platform.Errors().join(QLatin1Char('\n')).toStdString();
        WriteFile(TestDirectories::GetOatPerlScripts() + QStringLiteral("/PostProcess3.pl"), kPerlScript);

        m_handsets.AddHandset(QStringLiteral("phone"), QStringLiteral("Emulated phone"),
                              QStringLiteral("win32"));
        m_harness.SetLogger(m_log.log());
        m_harness.SetTestkit(m_kit.Root());
        m_harness.SetPlatform(m_dir.filePath(QStringLiteral("platform")));
        m_harness.SetTarget(QStringLiteral("phone"));
        m_harness.SetLogOutputPath(LogFolder());
    }

    void TearDown() override { m_harness.DisconnectTarget(); }

    virtual void BuildKit()
    {
        kitbuilder::Module audio = MakeModule(QStringLiteral("ctf"), QStringLiteral("Audio"),
                                              {QStringLiteral("play"), QStringLiteral("helper"),
                                               QStringLiteral("record"), QStringLiteral("never")});
        audio.secondaryModules = {QStringLiteral("Helper")};
        audio.package.classIds = {0x01230001};
        audio.package.programs = {{QStringLiteral("Audio_k"), QStringLiteral("-v")}};
        audio.package.behaviour = kAudioBehaviour;
        m_kit.AddSourceModule(QStringLiteral("tests/audio"), audio);

        kitbuilder::Module helper = MakeModule(QStringLiteral("secondary"), QStringLiteral("Helper"), {});
        helper.package.classIds = {0x01230009};
        m_kit.AddSourceModule(QStringLiteral("tests/helper"), helper);

        kitbuilder::Module browser = MakeModule(QStringLiteral("ctfapplet"), QStringLiteral("Browser"),
                                                {QStringLiteral("open"), QStringLiteral("close")});
        browser.package.appletIds = {kBrowserApplet};
        browser.package.behaviour = kBrowserBehaviour;
        m_kit.AddSourceModule(QStringLiteral("tests/browser"), browser);

        kitbuilder::Module menu = MakeModule(QStringLiteral("uitf"), QStringLiteral("Menu"),
                                             {QStringLiteral("open"), QStringLiteral("scroll")});
        menu.package.appletIds = {kMenuApplet};
        menu.package.behaviour = kMenuBehaviour;
        m_kit.AddSourceModule(QStringLiteral("tests/menu"), menu);

        for (const QString &name : {QStringLiteral("Pim"), QStringLiteral("Calendar")}) {
            kitbuilder::Module oat = MakeModule(QStringLiteral("oat"), name,
                                                {name + QStringLiteral("_first"),
                                                 name + QStringLiteral("_second")});
            oat.package.programs = {{QStringLiteral("oat:prog:") + name, QString(), kKeyedProgram}};
            m_kit.AddSourceModule(QStringLiteral("tests/") + name.toLower(), oat);
        }

        for (const QString &framework : m_frameworks)
            m_kit.AddFrameworkPackage(QStringLiteral("testframeworks"), framework,
                                      QStringLiteral("Win32"), QStringLiteral("Debug"));
        ModuleSpec oatFramework;
        oatFramework.directory = QStringLiteral("oat");
        oatFramework.classIds = {kOatFrameworkClass};
        oatFramework.appletIds = {kOatApplet};
        oatFramework.behaviour = kOatBehaviour;
        m_kit.AddFrameworkPackage(QStringLiteral("testframeworks"), QStringLiteral("oat"),
                                  QStringLiteral("Win32"), QStringLiteral("Debug"), &oatFramework);

        m_platform.AddSourceModule(QStringLiteral("tests/shell"),
                                   MakeModule(QStringLiteral("ctf"), QStringLiteral("Shell"),
                                              {QStringLiteral("boot")}));
        m_platform.AddFile(QStringLiteral("testframeworks/oat/tools/reference/deviceref.dso"),
                           "<dso><entry name=\"screen\" value=\"1\"/></dso>");
    }

    QString LogFolder() const { return m_dir.filePath(QStringLiteral("logs")); }
    QString HandsetFile(const QString &handsetPath) const
    {
        return m_handsets.HostPath(QStringLiteral("phone"), handsetPath);
    }

    QList<QSharedPointer<_TestModule>> Select(const QStringList &names)
    {
        QList<QSharedPointer<_TestModule>> modules;
        for (const QString &name : names) {
            QList<QSharedPointer<_TestModule>> one;
            m_harness.GetTestModules(one, QStringList{name}, QString(), QString());
            EXPECT_EQ(one.size(), 1) << name.toStdString();
            modules += one;
        }
        return modules;
    }

    void Queue(const QStringList &names)
    {
        for (const QSharedPointer<_TestModule> &module : Select(names))
            m_harness.AddTest(module);
    }

    ResultsView Results()
    {
        return ReadResults(HarnessControllerAccess::Environment(m_harness).value(
            QStringLiteral("ProcessedResultsPath")));
    }

    // The positions of the lines of the log, in order; -1 when missing.
    QList<int> Positions(const QStringList &lines)
    {
        const QString log = m_log.Text();
        QList<int> positions;
        int from = 0;
        for (const QString &line : lines) {
            const int at = log.indexOf(line, from);
            positions.append(at);
            if (at >= 0)
                from = at + line.size();
        }
        return positions;
    }

    QTemporaryDir m_dir;
    EnvGuard m_env;
    kitbuilder::KitBuilder m_kit;
    kitbuilder::KitBuilder m_platform;
    QStringList m_frameworks{QStringLiteral("ctf"), QStringLiteral("ctfapplet"), QStringLiteral("uitf")};
    testutil::HandsetFixture m_handsets;
    CapturedLog m_log;
    Harness m_harness;
};

TEST_F(HandsetRunTest, EveryModuleKindRunsAndIsRecorded)
{
    Queue({QStringLiteral("Pim"), QStringLiteral("Audio"), QStringLiteral("Menu"),
           QStringLiteral("Calendar"), QStringLiteral("Browser")});
    ASSERT_TRUE(m_harness.Run()) << m_log.Text().toStdString();

    // Sorted by type word: ctf, ctfapplet, oat (Calendar, Pim), uitf.
    const QList<int> order = Positions(
        {QStringLiteral("Loading Framework ctf\n"), QStringLiteral("Running KVK test Audio ID:Audio_k\n"),
         QStringLiteral("Loading Secondary Modules\n   Loading Secondary Module from KVK: Helper\n"),
         QStringLiteral("   Test Audio Run\n"), QStringLiteral("   Removing test Audio\n"),
         QStringLiteral("Unloading Framework ctf\n"), QStringLiteral("Loading Framework ctfapplet\n"),
         QStringLiteral("Running KVK test Browser ID:0X01230002\n"),
         QStringLiteral("Unloading Framework ctfapplet\n"), QStringLiteral("Loading Framework oat\n"),
         QStringLiteral("Running KVK test Calendar ID:Calendar\n"),
         QStringLiteral("Running KVK test Pim ID:Pim\n"), QStringLiteral("Unloading Framework oat\n"),
         QStringLiteral("Loading Framework uitf\n"), QStringLiteral("Running KVK test Menu ID:0X01230003\n"),
         QStringLiteral("Unloading Framework uitf\n")});
    EXPECT_FALSE(order.contains(-1)) << m_log.Text().toStdString();
    EXPECT_EQ(m_log.Text().count(QStringLiteral("Loading Framework oat\n")), 1);

    const ResultsView view = Results();
    ASSERT_TRUE(view.ok);
    const QMap<QString, QString> expected{
        {QStringLiteral("Audio/play"), QStringLiteral("pass")},
        {QStringLiteral("Audio/helper"), QStringLiteral("pass")},
        {QStringLiteral("Audio/record.1"), QStringLiteral("fail")},
        {QStringLiteral("Audio/never"), QStringLiteral("unexecuted")},
        {QStringLiteral("Browser/open"), QStringLiteral("pass")},
        {QStringLiteral("Browser/close"), QStringLiteral("unsupported")},
        {QStringLiteral("Calendar/Calendar_first"), QStringLiteral("pass")},
        {QStringLiteral("Calendar/Calendar_second"), QStringLiteral("fail")},
        {QStringLiteral("Calendar/perl_checked"), QStringLiteral("pass")},
        {QStringLiteral("Pim/Pim_first"), QStringLiteral("pass")},
        {QStringLiteral("Pim/Pim_second"), QStringLiteral("fail")},
        {QStringLiteral("Pim/perl_checked"), QStringLiteral("pass")},
        {QStringLiteral("Menu/open"), QStringLiteral("pass")},
        {QStringLiteral("Menu/scroll"), QStringLiteral("fail")},
        {QStringLiteral("Shell/boot"), QStringLiteral("unexecuted")}};
    EXPECT_EQ(view.verdicts, expected);
    // "record" took the reported name "record.1" and moved behind "never".
    EXPECT_EQ(view.caseOrder.value(QStringLiteral("Audio")),
              (QStringList{QStringLiteral("play"), QStringLiteral("helper"), QStringLiteral("never"),
                           QStringLiteral("record.1")}));
    EXPECT_EQ(view.modules.value(QStringLiteral("Shell")).attribute(QStringLiteral("source")),
              QStringLiteral("PVS"));
    EXPECT_EQ(view.modules.value(QStringLiteral("Audio")).attribute(QStringLiteral("family")),
              QStringLiteral("family-audio"));
    EXPECT_FALSE(view.modules.contains(QStringLiteral("Helper")));

    // Every module was removed and every framework the run loaded unloaded.
    EXPECT_FALSE(QFileInfo::exists(HandsetFile(QStringLiteral("fs:/usermods/Audio"))));
    EXPECT_FALSE(QFileInfo::exists(HandsetFile(QStringLiteral("fs:/usermods/Helper"))));
    EXPECT_FALSE(QFileInfo::exists(HandsetFile(QStringLiteral("fs:/usermods/Menu"))));
    EXPECT_FALSE(QFileInfo::exists(HandsetFile(QStringLiteral("fs:/usermods/oat"))));
    EXPECT_TRUE(m_log.Text().contains(QStringLiteral("   Post Processing Oat")));
}

TEST_F(HandsetRunTest, OatFrameworkFoundLoadedStaysAndNoDeleteKeepsModules)
{
    ASSERT_TRUE(m_harness.Load(QStringLiteral("oat")));
    ASSERT_TRUE(QFileInfo::exists(HandsetFile(QStringLiteral("fs:/usermods/oat"))));
    m_harness.SetNoDelete(true);
    m_harness.SetCopyDelay(QStringLiteral("1500"));
    m_harness.SetTestCases({QStringLiteral("Calendar_second")});
    Queue({QStringLiteral("Pim"), QStringLiteral("Audio"), QStringLiteral("Calendar")});

    ASSERT_TRUE(m_harness.Run());
    const QString log = m_log.Text();
    EXPECT_TRUE(log.contains(QStringLiteral("Harness::Run Framework oat already loaded")));
    EXPECT_FALSE(log.contains(QStringLiteral("Unloading Framework oat")));
    EXPECT_TRUE(log.contains(QStringLiteral("Unloading Framework ctf\n")));
    EXPECT_FALSE(log.contains(QStringLiteral("Removing test")));
    EXPECT_EQ(log.count(QStringLiteral("   Sleeping 1500 Milliseconds\n")), 3);
    EXPECT_TRUE(QFileInfo::exists(HandsetFile(QStringLiteral("fs:/usermods/oat"))));
    EXPECT_TRUE(QFileInfo::exists(HandsetFile(QStringLiteral("fs:/usermods/Audio"))));
    EXPECT_TRUE(QFileInfo::exists(HandsetFile(QStringLiteral("fs:/usermods/Helper"))));

    // The test cases went to the first module run (Audio, a CTF module, which
    // ignores them), not to the OAT modules after it.
    const QStringList oatCalls = QString::fromLatin1(testutil::ReadFile(
                                                         m_handsets.HandsetFolder(QStringLiteral("phone"))
                                                         + QStringLiteral("/oat-calls.txt")))
                                     .split(QLatin1Char('\n'), Qt::SkipEmptyParts);
    EXPECT_EQ(oatCalls, (QStringList{QStringLiteral("-dk -ra Calendar"), QStringLiteral("-dk -ra Pim")}));
}

TEST_F(HandsetRunTest, TestCasesReachTheFirstOatModuleOnly)
{
    m_harness.SetTestCases({QStringLiteral("Calendar_second")});
    Queue({QStringLiteral("Pim"), QStringLiteral("Calendar")});
    ASSERT_TRUE(m_harness.Run());
    const QStringList oatCalls = QString::fromLatin1(testutil::ReadFile(
                                                         m_handsets.HandsetFolder(QStringLiteral("phone"))
                                                         + QStringLiteral("/oat-calls.txt")))
                                     .split(QLatin1Char('\n'), Qt::SkipEmptyParts);
    EXPECT_EQ(oatCalls, (QStringList{QStringLiteral("-dk -rs Calendar,Calendar_second"),
                                     QStringLiteral("-dk -ra Pim")}));
}

TEST_F(HandsetRunTest, HandsetGoingOfflineEndsTheRunAndKeepsWhatWasRecorded)
{
    WriteFile(m_handsets.HandsetFolder(QStringLiteral("phone")) + QStringLiteral("/go-offline"), "");
    Queue({QStringLiteral("Pim"), QStringLiteral("Audio"), QStringLiteral("Menu")});
    EXPECT_FALSE(m_harness.Run());
    const QString log = m_log.Text();
    EXPECT_TRUE(log.endsWith(QStringLiteral("Device Connection has died."))) << log.toStdString();
    EXPECT_TRUE(log.contains(QStringLiteral("Unloading Framework ctf\nLoading Framework oat\n")));
    EXPECT_FALSE(log.contains(QStringLiteral("Unloading Framework oat")));
    EXPECT_FALSE(log.contains(QStringLiteral("Running KVK test Menu")));
    // The module run before the handset went away is in the file.
    const ResultsView view = Results();
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/play")), QStringLiteral("pass"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Pim/Pim_first")), QStringLiteral("unexecuted"));
}

class HandsetRunWithoutUtFrameworkTest : public HandsetRunTest
{
protected:
    void BuildKit() override
    {
        m_frameworks.removeAll(QStringLiteral("uitf"));
        HandsetRunTest::BuildKit();
        // A CTF module built for ARM handsets only cannot start on this one.
        kitbuilder::Module armOnly = MakeModule(QStringLiteral("ctf"), QStringLiteral("ArmOnly"),
                                                {QStringLiteral("a")});
        armOnly.variants = {QStringLiteral("RVCT22arm9_Release")};
        armOnly.package.programs = {{QStringLiteral("ArmOnly_k"), QString()}};
        m_kit.AddSourceModule(QStringLiteral("tests/armonly"), armOnly);
    }
};

TEST_F(HandsetRunWithoutUtFrameworkTest, MissingFrameworkAndFailedStartLetTheRunGoOn)
{
    Queue({QStringLiteral("Menu"), QStringLiteral("ArmOnly"), QStringLiteral("Audio")});
    ASSERT_TRUE(m_harness.Run());
    const QList<int> order = Positions({QStringLiteral("Running KVK test ArmOnly ID:"),
                                        QStringLiteral("Test ArmOnly Failed\n"),
                                        QStringLiteral("Running KVK test Audio ID:Audio_k\n"),
                                        QStringLiteral("   Removing test Audio\n"),
                                        QStringLiteral("Unloading Framework ctf\n"),
                                        QStringLiteral("Framework uitf not found.\n")});
    EXPECT_FALSE(order.contains(-1)) << m_log.Text().toStdString();
    const ResultsView view = Results();
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/play")), QStringLiteral("pass"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Menu/open")), QStringLiteral("unexecuted"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("ArmOnly/a")), QStringLiteral("unexecuted"));
}

TEST_F(HandsetRunTest, LogsOfARunAreReprocessedIntoTheSameVerdicts)
{
    Queue({QStringLiteral("Audio"), QStringLiteral("Browser"), QStringLiteral("Menu")});
    ASSERT_TRUE(m_harness.Run());
    const ResultsView run = Results();

    CapturedLog log;
    Harness again;
    again.SetLogger(log.log());
    again.SetTestkit(m_kit.Root());
    again.SetPlatform(m_dir.filePath(QStringLiteral("platform")));
    again.SetLogOutputPath(LogFolder());
    ASSERT_TRUE(again.Process(0));
    const ResultsView reprocessed = ReadResults(
        LogFolder() + QStringLiteral("/ProcessedResults/ProcessedResults.xml"));
    EXPECT_EQ(reprocessed.verdicts, run.verdicts);
}

TEST_F(HandsetRunTest, UnknownModuleInTheLogIsWarned)
{
    Queue({QStringLiteral("Browser")});
    ASSERT_TRUE(m_harness.Run());
    // The copied log now names a module no catalogue knows.
    QDirIterator logs(LogFolder(), {QStringLiteral("browser*.log")}, QDir::Files);
    ASSERT_TRUE(logs.hasNext());
    const QString path = logs.next();
    QByteArray text = testutil::ReadFile(path);
    text.replace("Manifest Name:Browser", "Manifest Name:Stranger");
    WriteFile(path, text);
    ASSERT_TRUE(m_harness.Process(0));
    EXPECT_TRUE(m_log.Text().contains(
        QStringLiteral("   Warning: Module Name:Stranger not found in the manifests.\n")));
}

} // namespace
