#include "cli_test.h"

#include "support/testutil.h"

#include <QDir>
#include <QFile>
#include <QJsonDocument>
#include <QLockFile>
#include <QProcess>
#include <QRegularExpression>
#include <QStandardPaths>
#include <QTemporaryDir>
#include <QUrl>

#include <gtest/gtest.h>

#include <csignal>
#include <unistd.h>

using namespace Qt::StringLiterals;
using testutil::ReadFile;
using testutil::WriteFile;

namespace {

// Reads the tool's standard error into err until it holds text or the tool ends.
void ReadUntil(QProcess &tool, QByteArray &err, const char *text)
{
    while (!err.contains(text) && tool.state() == QProcess::Running) {
        tool.waitForReadyRead(5000);
        err += tool.readAllStandardError();
    }
}

// The tool on a terminal: "script" gives it one; everything it wrote, both
// streams. Empty when there is no "script" here.
QByteArray OnTerminal(const QStringList &arguments, const QProcessEnvironment &env, const QString &folder)
{
    if (!testutil::HaveProgram(u"script"_s))
        return {};
    QStringList quoted{HarnessProgram()};
    for (const QString &argument : arguments)
        quoted.append(u'\'' + argument + u'\'');
    QProcess tool;
    tool.setProcessEnvironment(env);
    tool.setWorkingDirectory(folder);
    tool.start(u"script"_s, {u"-q"_s, u"-e"_s, u"-c"_s, quoted.join(u' '), u"/dev/null"_s});
    tool.closeWriteChannel();
    return tool.waitForFinished(120000) ? tool.readAll() : QByteArray();
}

// Makes the ITimer module of the demo kit one that never completes its log:
// its package is taken apart and put together again with tar.
void HangITimer(const QString &root)
{
    const QString folder = root + u"/kits/DemoKit/tests/system/timer/ITimer/package"_s;
    const QString package = folder + u"/ITimer_Win32_Release.kestix"_s, work = folder + u"/unpacked"_s;
    ASSERT_TRUE(QDir().mkpath(work));
    ASSERT_EQ(testutil::RunProgram(u"tar"_s, {u"-xf"_s, package, u"-C"_s, work}), 0);
    const QString behaviour = work + u"/itimer/behaviour"_s;
    QByteArray script = ReadFile(behaviour);
    ASSERT_TRUE(script.contains("echo '[/VERBOSE]'\n"));
    WriteFile(behaviour, script.replace("echo '[/VERBOSE]'\n", ""));
    ASSERT_EQ(testutil::RunProgram(u"tar"_s, {u"-cf"_s, package, u"-C"_s, work, u"itimer"_s}), 0);
    QDir(work).removeRecursively();
}

// A fresh demo environment per test, and the tool run against it.
class DemoRun : public ::testing::Test
{
protected:
    void SetUp() override
    {
        const ToolResult init = RunTool(Args("demo init", root));
        ASSERT_EQ(init.status, 0) << init.err.constData();
        static const QRegularExpression line(u"^export (\\w+)='(.*)'$"_s);
        for (const QString &text : QString::fromUtf8(init.out).split(u'\n', Qt::SkipEmptyParts)) {
            const QRegularExpressionMatch m = line.match(text);
            ASSERT_TRUE(m.hasMatch()) << text.toStdString();
            env.insert(m.captured(1), m.captured(2));
        }
        env.insert(u"KESTIX_TIME_SCALE"_s, u"0"_s);
        handsets = env.value(u"KESTIX_HANDSETS"_s);
    }

    QStringList WithLog(QStringList arguments) const
    {
        arguments.insert(1, u"--log"_s);
        arguments.insert(2, dir.filePath(u"harness.log"_s));
        return arguments;
    }

    // The tool with its log in the test's folder; the arguments as Args takes them.
    template <typename... Parts> ToolResult Tool(const Parts &...parts)
    {
        return RunTool(WithLog(Args(parts...)), env, dir.path());
    }

    // Starts the tool in the background; returns its standard error up to where it says text.
    QByteArray Start(QProcess &tool, const QStringList &arguments, const char *text)
    {
        tool.setProcessEnvironment(env);
        tool.setWorkingDirectory(dir.path());
        tool.setReadChannel(QProcess::StandardError);
        tool.start(HarnessProgram(), WithLog(arguments));
        EXPECT_TRUE(tool.waitForStarted());
        QByteArray err;
        ReadUntil(tool, err, text);
        return err;
    }

    QString Results(const QString &handset) const
    {
        return targets + u'/' + handset + u"/Logs/ProcessedResults/ProcessedResults.xml"_s;
    }

    // Handsets beside the demo's own, with its settings plus extra lines.
    void AddHandset(const QString &name, const QByteArray &extra = QByteArray())
    {
        ASSERT_TRUE(QDir().mkpath(handsets + u'/' + name + u"/fs"_s));
        WriteFile(handsets + u'/' + name + u"/handset.ini"_s,
                  ReadFile(handsets + u"/demo-phone/handset.ini"_s) + extra);
    }

    // The JUnit file, checked against the schema CI servers read.
    static QDomElement JUnit(const QString &path)
    {
        testutil::ExpectXmllintAccepts(path, u"junit/junit.xsd"_s);
        return ReadXml(path).documentElement();
    }

    // How many progress lines "[n/6] demo-phone  ..." the output holds.
    static qsizetype ProgressLines(const QByteArray &out)
    {
        return QString::fromUtf8(out).count(
            QRegularExpression(u"^\\[[1-6]/6\\] demo-phone  "_s, QRegularExpression::MultilineOption));
    }

    // What is left installed on the demo's handset besides the framework folder.
    QStringList Installed() const
    {
        QStringList left
            = QDir(handsets + u"/demo-phone/fs/usermods"_s).entryList(QDir::AllEntries | QDir::NoDotAndDotDot);
        left.removeAll(u"CTF"_s);
        return left;
    }

    QTemporaryDir dir;
    const QString root = dir.filePath(u"demo"_s), targets = root + u"/data/Norvane/Targets"_s;
    const QString results = Results(u"demo-phone"_s), ini = root + u"/handsets/demo-phone/handset.ini"_s;
    const QString testData = root + u"/testdata/demo.ksx"_s, junit = dir.filePath(u"junit.xml"_s);
    QString handsets;
    QProcessEnvironment env = QProcessEnvironment::systemEnvironment();
};

TEST_F(DemoRun, ReportsEveryModuleOfThisRunWithItsHandsetTimesLogsAndProgress)
{
    const QString json = dir.filePath(u"summary.json"_s);
    const ToolResult r = Tool("run --test-data", testData, "--junit", junit, "--json", json);
    EXPECT_EQ(r.status, 1) << r.err.constData(); // some demo test cases fail on purpose
    const QMap<QString, QString> expected{
        {u"ITimer"_s, u"demo-phone 3 1 1 0"_s},  {u"IClock"_s, u"demo-phone 3 0 0 0"_s},
        {u"Widgets"_s, u"demo-phone 2 1 0 0"_s}, {u"OatAudio"_s, u"demo-phone 2 1 1 0"_s},
        {u"Sockets"_s, u"demo-phone 2 1 1 0"_s}, {u"PlatformVersion"_s, u"demo-phone 2 0 0 0"_s}};
    EXPECT_EQ(Rows(r.out), expected) << r.out.constData();
    // One progress line per module, then the totals, with no colour off a terminal.
    const QString out = QString::fromUtf8(r.out);
    EXPECT_TRUE(out.contains(
        QRegularExpression(u"\n\\[[1-6]/6\\] demo-phone  ITimer +3 passed 1 failed 1 unsupported  \\d+\\.\\d s\n"_s)));
    EXPECT_EQ(ProgressLines(r.out), 6);
    EXPECT_TRUE(
        out.contains(QRegularExpression(u"Total \\(6 modules\\).*\nElapsed: \\d+\\.\\d s\nSlowest: \\w+ \\d"_s)));
    // The library's own messages stay in its log unless asked for.
    ExpectLacks(r.out + r.err, {"\033", "Running KVK test"});
    ExpectContains(ReadFile(dir.filePath(u"harness.log"_s)), {"Running KVK test"});

    const QDomElement suites = JUnit(junit);
    EXPECT_EQ(suites.attribute(u"failures"_s), u"4"_s);
    EXPECT_EQ(suites.attribute(u"errors"_s), u"0"_s);
    const QDomElement timer = suites.elementsByTagName(u"testsuite"_s).at(1).toElement();
    EXPECT_EQ(timer.attribute(u"name"_s), u"ITimer"_s);
    EXPECT_EQ(timer.attribute(u"hostname"_s), u"demo-phone"_s);
    EXPECT_FALSE(timer.attribute(u"timestamp"_s).isEmpty());
    const QString message = timer.elementsByTagName(u"failure"_s).at(0).toElement().attribute(u"message"_s);
    ExpectContains(message.toUtf8(), {"Test: Expiry / Result: FAIL", "/Logs/ITimer-"});
    // The unit test log gives each test case's time.
    const QDomElement sockets = suites.elementsByTagName(u"testsuite"_s).at(5).toElement();
    EXPECT_EQ(sockets.firstChildElement(u"testcase"_s).attribute(u"time"_s), u"0.007"_s);

    const QJsonDocument summary = QJsonDocument::fromJson(ReadFile(json));
    EXPECT_FALSE(summary[u"start"].toString().isEmpty());
    EXPECT_EQ(summary[u"handsets"][0].toString(), u"demo-phone"_s);
    EXPECT_EQ(summary[u"modules"][0][u"handset"].toString(), u"demo-phone"_s);
    EXPECT_TRUE(QFile::exists(summary[u"modules"][0][u"logs"][0].toString()));
    EXPECT_GE(summary[u"modules"][0][u"durationMs"].toInteger(-1), 0);

    // "-" is standard output, and the summary then goes to standard error.
    EXPECT_EQ(QJsonDocument::fromJson(OutputOf(Tool("run IClock --json -")))[u"totals"][u"passed"].toInt(), 3);
    EXPECT_FALSE(QFile::exists(dir.filePath(u"-"_s)));
    const ToolResult verbose = Tool("run --verbose IClock");
    ExpectContains(verbose.err, {"Running KVK test IClock"});
    ExpectLacks(verbose.err, {"\n\n"});

    const QStringList arguments = WithLog(Args("run ITimer"));
    const QByteArray coloured = OnTerminal(arguments, env, dir.path());
    if (coloured.isEmpty())
        GTEST_SKIP() << "no terminal to try colour on ('script' is missing or did not run)";
    ExpectContains(coloured, {"\033[32m3 passed\033[0m \033[31m1 failed\033[0m"});
    env.insert(u"NO_COLOR"_s, u"1"_s);
    const QByteArray noColour = OnTerminal(arguments, env, dir.path());
    ExpectContains(noColour, {"ITimer  3 passed 1 failed 1 unsupported"});
    ExpectLacks(noColour, {"\033[3"});
}

TEST_F(DemoRun, AHandsetLostMidRunReportsErrorsNotAnEarlierRunsVerdicts)
{
    ASSERT_EQ(Tool("run").status, 1); // a history where every module ran
    WriteFile(ini, ReadFile(ini) + "offlineAfter=12\n");
    const QString html = dir.filePath(u"out/report.html"_s);
    QDir().mkpath(dir.filePath(u"out"_s));
    const ToolResult lost = Tool("run --junit", junit, "--html", html);
    EXPECT_EQ(lost.status, 1) << lost.err.constData();
    EXPECT_EQ(Rows(lost.out).size(), 6) << lost.out.constData();
    EXPECT_EQ(Rows(lost.out).value(u"PlatformVersion"_s), u"0 0 0 2"_s);
    ExpectContains(lost.out,
                   {"Not finished: IClock on demo-phone: handset lost",
                    "Not finished: Sockets: not run: every handset was lost", "HTML report: " + html.toUtf8() + "\n"});
    const QDomElement suites = JUnit(junit);
    EXPECT_EQ(suites.attribute(u"errors"_s), u"21"_s);
    EXPECT_EQ(suites.elementsByTagName(u"skipped"_s).size(), 0);
    EXPECT_EQ(suites.elementsByTagName(u"error"_s).at(0).toElement().attribute(u"message"_s), u"handset lost"_s);

    // The page is self-contained (inline style, nothing fetched) and has the
    // columns of a run, which the page of a results file has not.
    const QByteArray page = ReadFile(html);
    ExpectContains(page,
                   {"<b data-count=\"not finished\">6</b>", "Not finished: not run: every handset was lost", "<style>",
                    ">Duration</th>"});
    EXPECT_EQ(page.count("<tr class=\"module\""), 6);
    EXPECT_EQ(page.count("<span class=\"outcome notfinished\">not finished</span>"), 6);
    EXPECT_FALSE(QString::fromUtf8(page).contains(QRegularExpression(u"(src|href)=\"(https?:|//)"_s)));

    // What the library only logs reaches the console with --verbose: here the start the lost handset refused.
    WriteFile(ini, ReadFile(ini).replace("offlineAfter=12", "offlineAfter=5"));
    ASSERT_TRUE(QFile::remove(handsets + u"/demo-phone/offline"_s));
    ExpectContains(Tool("run --verbose IClock").err, {"CtfTestModule::Run error: IClock_k"});
}

TEST_F(DemoRun, AnInterruptedRunEndsTheModuleInHandAndReportsTheRest)
{
    env.insert(u"KESTIX_TIME_SCALE"_s, u"0.2"_s); // time to stop it mid-run
    for (const int stops : {1, 2}) {
        SCOPED_TRACE(stops);
        QProcess tool;
        // Stop as soon as the first module is under way.
        QByteArray err = Start(tool, Args("run --verbose --junit", junit), "Running KVK test");
        ASSERT_GT(tool.processId(), 0) << err.constData(); // never signal a whole process group
        ::kill(pid_t(tool.processId()), SIGINT);
        if (stops == 2) {
            ReadUntil(tool, err, "signal again");
            ::kill(pid_t(tool.processId()), SIGINT);
        }
        ASSERT_TRUE(tool.waitForFinished(60000));
        EXPECT_EQ(tool.exitCode(), 130);
        const QByteArray out = tool.readAllStandardOutput();
        if (QFile::exists(results))
            ReadXml(results);
        if (stops == 2) {
            ExpectLacks(out, {"Total ("});
            continue;
        }
        ExpectContains(out, {"interrupted before it ran"});
        EXPECT_EQ(Rows(out).value(u"IClock"_s), u"demo-phone 3 0 0 0"_s);
        EXPECT_EQ(Installed(), QStringList());
        EXPECT_GT(JUnit(junit).attribute(u"errors"_s).toInt(), 0);
        QFile::remove(junit);
    }
}

TEST_F(DemoRun, OneRunAtATimeOnAHandsetUnlessAskedToWait)
{
    QLockFile held(targets + u"/demo-phone/run.lock"_s);
    ASSERT_TRUE(QDir().mkpath(targets + u"/demo-phone"_s));
    ASSERT_TRUE(held.tryLock(0));
    ExpectRefused(Tool("run IClock"), "handset demo-phone is in use by process " + QByteArray::number(getpid()));

    QProcess waiting;
    const QByteArray err = Start(waiting, Args("run --wait IClock"), "waiting");
    held.unlock();
    ASSERT_TRUE(waiting.waitForFinished(60000));
    EXPECT_EQ(waiting.exitCode(), 0) << err.constData() << waiting.readAllStandardError().constData();
}

TEST_F(DemoRun, HandsetsAreTheOnesNamedAndADryRunSaysWhatWouldRunWhereAndTouchesNothing)
{
    AddHandset(u"demo-phone2"_s);
    EXPECT_EQ(Rows(OutputOf(Tool("run --target demo-phone IClock"))).value(u"IClock"_s), u"demo-phone 3 0 0 0"_s);
    ExpectRefused(Tool("run --target phone IClock"), "'phone' matches several handsets: demo-phone, demo-phone2");

    // Not even an offline handset is a reason to stop: nothing is connected.
    const QByteArray before = ReadFile(results);
    WriteFile(handsets + u"/demo-phone2/offline"_s, "");
    EXPECT_EQ(QString::fromUtf8(
                  OutputOf(Tool("run --dry-run --retry --timeout 90 --target demo-phone --target demo-phone2"))),
              u"Dry run: nothing is installed or started.\n"
              "5 modules shared by demo-phone, demo-phone2 (one queue in this order; each handset takes "
              "the next module when it is free):\n"
              "1. ITimer           ctf  KVK  5 test cases\n"
              "2. PlatformVersion  ctf  PVS  2 test cases\n"
              "3. Widgets          ctfapplet  KVK  3 test cases\n"
              "4. OatAudio         oat  KVK  4 test cases\n"
              "5. Sockets          uitf  KVK  4 test cases\n"
              "--retry leaves out what the processed results show passed: IClock\n"
              "A module still running after 90 s is stopped.\n"_s);
    EXPECT_EQ(ReadFile(results), before);
    EXPECT_FALSE(QFileInfo::exists(targets + u"/demo-phone/run.lock"_s));
    EXPECT_EQ(Installed(), QStringList());

    WriteFile(handsets + u"/demo-phone/offline"_s, "");
    ExpectRefused(Tool("run --target demo-phone IClock"), "handset demo-phone is offline");
    EXPECT_FALSE(QFileInfo::exists(Results(u"demo-phone2"_s)));
}

TEST_F(DemoRun, SetUpFailuresAndBadFiltersAreRefusedBeforeAnythingRuns)
{
    const QString missing = dir.filePath(u"missing/file"_s), empty = dir.filePath(u"empty"_s);
    WriteFile(dir.filePath(u"a-file"_s), "x");
    QDir().mkpath(empty);
    // Arguments, a variable set for the run and its value, the message.
    const std::tuple<QStringList, QString, QString, const char *> rows[] = {
        {Args("run --test-data", missing), {}, {}, "--test-data: "},
        {Args("run --dpk", missing), {}, {}, "--dpk: "},
        {Args("run"), u"KESTIX_TOOLSET"_s, missing, "tool set"},
        {Args("run --run-option bogus"), {}, {}, "unknown --run-option 'bogus'"},
        {Args("run --features", missing), {}, {}, "feature list"},
        {Args("run"), u"KESTIX_DATA_ROOT"_s, dir.filePath(u"a-file"_s), "is not a folder"},
        {Args("run --junit", missing), {}, {}, "cannot write --junit"},
        {Args("run --json", missing), {}, {}, "cannot write --json"},
        {Args("run --copy-delay soon"), {}, {}, "--copy-delay"},
        {Args("modules --kit nowhere"), {}, {}, "harness modules: no test kit 'nowhere'"},
        {Args("manifest --kit nowhere"), {}, {}, "harness manifest: no test kit 'nowhere'"},
        {Args("run IClock Nope"), {}, {}, "no module matches 'Nope'"},
        {Args("run --family media I*"), {}, {}, "no module matches 'I*' in family 'media'"},
        {Args("run --subfamily timer"), {}, {}, "--subfamily needs --family"},
        {Args("run --test-cases Nope,ReadClock IClock"), {}, {}, "has no test case 'Nope'"},
        {Args("run --target no-such-phone"), {}, {}, "no handset matching 'no-such-phone'"},
        {Args("run"), u"KESTIX_HANDSETS"_s, empty, "no handset attached"},
        {Args("process"), {}, {}, "--log-dir must name a folder of saved logs"},
        {Args("process --log-dir", dir.filePath(u"a-file"_s)), {}, {}, "--log-dir must name a folder of saved logs"},
        {Args("process --log-dir", empty), {}, {}, "no logs"},
        {Args("manifest -o", dir.filePath(u"a-file"_s)), {}, {}, "a-file"},
    };
    for (const auto &[arguments, variable, value, error] : rows) {
        SCOPED_TRACE((arguments.join(u' ') + u' ' + variable).toStdString());
        const QProcessEnvironment saved = env;
        if (!variable.isEmpty())
            env.insert(variable, value);
        ExpectRefused(Tool(arguments), error);
        env = saved;
    }
    EXPECT_FALSE(QFileInfo::exists(results));
    EXPECT_EQ(Installed(), QStringList());
    // A refused kit leaves no empty cache folder behind.
    const QDir caches(root + u"/data/Norvane/TestManifests"_s);
    for (const QString &cache : caches.entryList(QDir::Dirs | QDir::NoDotAndDotDot))
        EXPECT_FALSE(QDir(caches.filePath(cache)).isEmpty()) << cache.toStdString();
}

TEST_F(DemoRun, FiltersSelectWhatTheyNameAndTheManifestKeepsBothCatalogues)
{
    const QByteArray modules = OutputOf(Tool("modules"));
    ExpectContains(modules, {"ITimer\tctf\tsystem\ttimer\tKVK\t5\n", "PlatformVersion\tctf\tcore\tversion\tPVS\t2\n"});
    ExpectLacks(modules, {"Helper"}); // secondary modules are never offered
    const ToolResult family = Tool("run --family SYSTEM --subfamily timer I*");
    EXPECT_EQ(Rows(family.out).keys(), QStringList{u"ITimer"_s}) << family.out.constData() << family.err.constData();
    OutputOf(Tool("run --test-cases ReadClock *clock"));

    const QString folder = dir.filePath(u"catalogues"_s);
    OutputOf(Tool("manifest -o", folder));
    ExpectContains(ReadXml(folder + u"/KVKManifest.xml"_s).toByteArray(), {"ITimer"});
    ExpectContains(ReadXml(folder + u"/PlatformManifest.xml"_s).toByteArray(), {"PlatformVersion"});
}

TEST_F(DemoRun, RetryAndProcessWorkFromTheHistoryAndAnUnreadableOneIsSaidOutLoud)
{
    const QByteArray settings = ReadFile(ini);
    WriteFile(ini, settings + "offlineAfter=40\n");
    ASSERT_EQ(Tool("run").status, 1);
    QFile::remove(handsets + u"/demo-phone/offline"_s);
    WriteFile(ini, settings);
    // Every module not shown passed runs again, those the lost run never reached too.
    const ToolResult retry = Tool("run --retry");
    EXPECT_EQ(retry.status, 1);
    EXPECT_EQ(Rows(retry.out).keys(), (QStringList{u"ITimer"_s, u"OatAudio"_s, u"Sockets"_s, u"Widgets"_s}))
        << retry.out.constData();

    const QString again = dir.filePath(u"again.xml"_s);
    const ToolResult process = Tool("process --log-dir", targets + u"/demo-phone/Logs"_s, "--results", again);
    EXPECT_EQ(process.status, 1) << process.err.constData(); // as report: a test case failed
    EXPECT_EQ(Rows(process.out).value(u"ITimer"_s), u"3 1 1 0"_s) << process.out.constData();
    EXPECT_TRUE(QFile::exists(again));

    WriteFile(results, ReadFile(results).left(60));
    ExpectRefused(Tool("run --retry"), "cannot retry: the processed results of demo-phone are unreadable");
    const QString run = QString::fromUtf8(OutputOf(Tool("run IClock")));
    const QRegularExpressionMatch kept = QRegularExpression(u"were kept as (\\S+)"_s).match(run);
    ASSERT_TRUE(kept.hasMatch()) << run.toStdString();
    EXPECT_EQ(ReadFile(kept.captured(1)).size(), 60);
}

TEST_F(DemoRun, SharedRunsNameTheHandsetOfEachModule)
{
    AddHandset(u"demo-phone2"_s, "offlineAfter=1\n"); // lost with a module in hand
    AddHandset(u"demo-phone3"_s);
    WriteFile(handsets + u"/demo-phone3/offline"_s, "");
    const ToolResult r = Tool("run --verbose --all-targets --test-data", testData);
    EXPECT_EQ(r.status, 1) << r.err.constData();
    // Every progress line and every library line names its handset.
    EXPECT_EQ(ProgressLines(r.out), 6) << r.out.constData();
    ExpectContains(r.out,
                   {"handset lost; the module goes back to the queue", "Handset demo-phone2 dropped out at ",
                    "Handset demo-phone3 could not be connected"});
    ExpectContains(r.err, {"\ndemo-phone: Running KVK test ITimer", "\ndemo-phone2: Running "});
    const QMap<QString, QString> rows = Rows(r.out);
    EXPECT_EQ(rows.size(), 6);
    EXPECT_EQ(rows.value(u"ITimer"_s), u"demo-phone 3 1 1 0"_s);
    EXPECT_EQ(rows.value(u"OatAudio"_s), u"demo-phone 2 1 1 0"_s);
}

TEST_F(DemoRun, RunAndProcessTakeTheKitPlatformAndLogTheyAreGiven)
{
    // Without the variables there is no kit; the options name it instead.
    const QStringList kit{u"--kit"_s, env.value(u"KESTIX_TESTSET"_s), u"--platform"_s, env.value(u"KESTIX_PLATFORM"_s)};
    for (const char *name : {"KESTIX_TESTSET", "KESTIX_PLATFORM", "KESTIX_TESTSETS_ALL", "KESTIX_PLATFORMS_ALL"})
        env.remove(QString::fromLatin1(name));
    const QString log = dir.filePath(u"given.log"_s), processLog = dir.filePath(u"process.log"_s);
    EXPECT_EQ(RunTool(Args("run IClock"), env, dir.path()).status, 2);
    const QByteArray run = OutputOf(RunTool(Args("run", kit, "--log", log, "IClock PlatformVersion"), env, dir.path()));
    EXPECT_EQ(Rows(run).size(), 2) << run.constData(); // a kit module and a platform module
    ExpectContains(ReadFile(log), {"Running KVK test IClock"});
    OutputOf(RunTool(Args("process", kit, "--log", processLog, "--log-dir", targets + u"/demo-phone/Logs"_s), env,
                     dir.path()));
    ExpectContains(ReadFile(processLog), {"Process Complete"});
}

TEST_F(DemoRun, ShardsOfOneSelectionMergeIntoTheVerdictsOfOneRun)
{
    // The plan touches no handset.
    ExpectContains(OutputOf(Tool("run --plan --shard-count 2")), {"Shard 0 of 2", "Shard 1 of 2"});
    EXPECT_FALSE(QFile::exists(results));
    EXPECT_EQ(Tool("run --shard-index 2 --shard-count 2").status, 2);

    // Shard 0 as Bazel starts it, shard 1 by option on another handset.
    AddHandset(u"other-phone"_s);
    const QString status = dir.filePath(u"shard-status"_s), timings = dir.filePath(u"timings.json"_s);
    QProcessEnvironment bazel = env;
    bazel.insert(u"TEST_SHARD_INDEX"_s, u"0"_s);
    bazel.insert(u"TEST_TOTAL_SHARDS"_s, u"2"_s);
    bazel.insert(u"TEST_SHARD_STATUS_FILE"_s, status);
    const ToolResult first = RunTool(WithLog(Args("run --target demo-phone --test-data", testData)), bazel, dir.path());
    EXPECT_LE(first.status, 1) << first.err.constData();
    EXPECT_TRUE(QFile::exists(status));
    const ToolResult second = Tool("run --target other-phone --test-data", testData, "--shard-index 1 --shard-count 2");
    EXPECT_LE(second.status, 1) << second.err.constData();
    EXPECT_EQ(Rows(first.out).size() + Rows(second.out).size(), 6);

    const ToolResult merged
        = Tool("report --merge", results, Results(u"other-phone"_s), "--expect-all --save-timings", timings);
    EXPECT_EQ(merged.status, 1) << merged.err.constData(); // the demo's failures
    const QMap<QString, QString> rows = Rows(merged.out);
    EXPECT_EQ(rows.size(), 6) << merged.out.constData();
    EXPECT_EQ(rows.value(u"ITimer"_s).section(u' ', 1), u"3 1 1 0"_s);
    EXPECT_EQ(rows.value(u"OatAudio"_s).section(u' ', 1), u"2 1 1 0"_s);
    EXPECT_EQ(rows.value(u"PlatformVersion"_s).section(u' ', 1), u"2 0 0 0"_s);
    // Each shard's module times came along, and plan the next split.
    ExpectContains(OutputOf(Tool("run --plan --shard-count 2 --timings", timings)), {" ms"});

    // A shard that never reported leaves its modules not run.
    const ToolResult half = Tool("report --merge", results, "--expect-all");
    EXPECT_EQ(half.status, 1);
    EXPECT_EQ(Rows(half.out).size(), 6) << half.out.constData();
    ExpectContains(half.out, {"not run by any shard"});
}

TEST_F(DemoRun, AModulePastItsTimeoutIsStoppedRemovedAndReportedWhileTheRunGoesOn)
{
    HangITimer(root);
    // 150 s on the library's clock: instant at time scale 0.
    const ToolResult r = Tool("run --timeout 150 --junit", junit, "ITimer IClock");
    EXPECT_EQ(r.status, 1) << r.err.constData();
    ExpectContains(r.out, {"Not finished: ITimer on demo-phone: stopped after its time limit of 150 s"});
    EXPECT_EQ(Rows(r.out).value(u"IClock"_s), u"demo-phone 3 0 0 0"_s);
    // Off a terminal, a long module shows it is alive once a minute.
    static const QRegularExpression alive(
        uR"(\n\[\.\.\.\] demo-phone  ITimer  still running: waiting for its log, [12] min \d+ s\n)"_s);
    EXPECT_EQ(QString::fromUtf8(r.out).count(alive), 2) << r.out.constData();
    EXPECT_EQ(Installed(), QStringList());
    EXPECT_EQ(JUnit(junit).attribute(u"errors"_s), u"5"_s);

    for (const char *bad : {"0", "-3", "soon", "1e9"})
        ExpectRefused(Tool("run --timeout", bad), "--timeout needs a number of seconds");
    // On a terminal the same wait is a status line rewritten in place.
    const QByteArray terminal = OnTerminal(WithLog(Args("run --timeout 20 ITimer")), env, dir.path());
    if (terminal.isEmpty())
        GTEST_SKIP() << "no terminal to try the status line on ('script' is missing or did not run)";
    EXPECT_TRUE(QString::fromUtf8(terminal).contains(
        QRegularExpression(u"\r\033\\[KITimer on demo-phone: waiting for its log, 1\\d s"_s)))
        << terminal.constData();
    ExpectLacks(terminal, {"still running"});
}

// Headless Chromium renders the report of a run shared by two handsets.
TEST_F(DemoRun, TheHtmlReportWorksInARealBrowser)
{
    const QString chromium = QStandardPaths::findExecutable(u"chromium"_s);
    if (chromium.isEmpty())
        GTEST_SKIP()
            << "headless browser test skipped: no 'chromium' on PATH (./run installs Debian's chromium package)";
    AddHandset(u"demo-phone2"_s);
    const QString html = dir.filePath(u"report.html"_s);
    ASSERT_EQ(Tool("run --all-targets --test-data", testData, "--html", html).status, 1);

    // Every link is a relative one to a copied log, or one within the page.
    int logLinks = 0;
    static const QRegularExpression link(u"href=\"(?!#)([^\"]*)\""_s);
    for (auto it = link.globalMatch(QString::fromUtf8(ReadFile(html))); it.hasNext(); ++logLinks) {
        const QString target = it.next().captured(1);
        EXPECT_TRUE(target.startsWith(u"demo/data/Norvane/Targets/demo-phone"_s)) << target.toStdString();
        EXPECT_TRUE(QFileInfo(dir.filePath(QUrl::fromPercentEncoding(target.toUtf8()))).isFile())
            << target.toStdString();
    }
    EXPECT_GE(logLinks, 7); // Sockets has two

    // The page after its script ran; standard error holds its console.
    QTemporaryDir profile;
    QByteArray console;
    const auto browse = [&](const QString &fragment) {
        QProcess browser;
        browser.start(chromium,
                      Args("--headless --no-sandbox --disable-gpu --disable-quic --no-first-run --dump-dom "
                           "--disable-background-networking --disable-component-update --disable-sync "
                           "--enable-logging=stderr --v=0",
                           u"--user-data-dir="_s + profile.path(), QUrl::fromLocalFile(html).toString() + fragment));
        const bool ran = browser.waitForFinished(120000) && browser.exitCode() == 0;
        console = browser.readAllStandardError();
        return ran ? browser.readAllStandardOutput() : QByteArray();
    };
    const QByteArray dom = browse(QString());
    if (dom.isEmpty())
        GTEST_SKIP() << "headless browser test skipped: chromium did not run here: " << console.constData();
    ExpectLacks(console, {":CONSOLE"}); // the page writes nothing to the console: any line there is an error
    ExpectContains(dom,
                   {"<b data-count=\"passed\">14</b>", "<b data-count=\"failed\">4</b>",
                    "<b data-count=\"unsupported\">3</b>", "data-filter=\"all\""});
    ExpectLacks(dom, {"hidden=\"\""});
    EXPECT_EQ(dom.count("<g class=\"lane\""), 2);
    EXPECT_EQ(dom.count("<rect class=\"module "), 6);

    // "#failures" in the address leaves only the modules with a failure.
    const QByteArray failures = browse(u"#failures"_s);
    ExpectContains(failures, {"data-filter=\"failures\""});
    static const QRegularExpression row(
        u"<tr class=\"module\" data-module=\"\\w+\" data-ok=\"(\\d)\"( hidden=\"\")?>"_s);
    int shown = 0;
    for (auto it = row.globalMatch(QString::fromUtf8(failures)); it.hasNext();) {
        const QRegularExpressionMatch m = it.next();
        EXPECT_EQ(m.captured(2).isEmpty(), m.captured(1) == u"0"_s) << m.captured(0).toStdString();
        shown += m.captured(2).isEmpty() ? 1 : 0;
    }
    EXPECT_EQ(shown, 4);
}

} // namespace
