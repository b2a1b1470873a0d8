#include "cli_test.h"

#include "support/testutil.h"

#include <QCoreApplication>
#include <QDir>
#include <QDomDocument>
#include <QFile>
#include <QJsonArray>
#include <QJsonDocument>
#include <QJsonObject>
#include <QLockFile>
#include <QProcess>
#include <QRegularExpression>
#include <QSet>
#include <QStandardPaths>
#include <QTemporaryDir>
#include <QThread>
#include <QUrl>

#include <gtest/gtest.h>

#include <csignal>

using namespace Qt::StringLiterals;

namespace {

// A fresh demo environment per test, and the tool run against it.
class DemoRun : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(dir.isValid());
        root = dir.filePath(u"demo"_s);
        const ToolResult init = RunTool({u"demo"_s, u"init"_s, root});
        ASSERT_EQ(init.status, 0) << init.err.constData();
        env = QProcessEnvironment::systemEnvironment();
        static const QRegularExpression line(u"^export (\\w+)='(.*)'$"_s);
        for (const QString &text : QString::fromUtf8(init.out).split(u'\n', Qt::SkipEmptyParts)) {
            const QRegularExpressionMatch m = line.match(text);
            ASSERT_TRUE(m.hasMatch()) << text.toStdString();
            env.insert(m.captured(1), m.captured(2));
        }
        env.insert(u"KESTIX_TIME_SCALE"_s, u"0"_s);
        handsets = env.value(u"KESTIX_HANDSETS"_s);
        targets = root + u"/data/Norvane/Targets"_s;
        results = targets + u"/demo-phone/Logs/ProcessedResults/ProcessedResults.xml"_s;
        testData = root + u"/testdata/demo.ksx"_s;
    }

    QStringList WithLog(QStringList arguments) const
    {
        arguments.insert(1, u"--log"_s);
        arguments.insert(2, dir.filePath(u"harness.log"_s));
        return arguments;
    }

    ToolResult Tool(const QStringList &arguments) { return RunTool(WithLog(arguments), env, dir.path()); }

    // Handsets beside the demo's own, with its settings plus extra lines.
    void AddHandset(const QString &name, const QByteArray &extra = QByteArray())
    {
        ASSERT_TRUE(QDir().mkpath(handsets + u'/' + name + u"/fs"_s));
        testutil::WriteFile(handsets + u'/' + name + u"/handset.ini"_s,
                            testutil::ReadFile(handsets + u"/demo-phone/handset.ini"_s) + extra);
    }
    void AddToIni(const QString &name, const QByteArray &extra)
    {
        const QString ini = handsets + u'/' + name + u"/handset.ini"_s;
        testutil::WriteFile(ini, testutil::ReadFile(ini) + extra);
    }

    // Module name -> "handset passed failed unsupported unexecuted" of its summary row.
    static QMap<QString, QString> Rows(const QByteArray &out)
    {
        QMap<QString, QString> rows;
        static const QRegularExpression row(u"^(\\w+)\\s+([\\w-]*)\\s+(\\d+)\\s+(\\d+)\\s+(\\d+)\\s+(\\d+)$"_s);
        for (const QString &text : QString::fromUtf8(out).split(u'\n')) {
            const QRegularExpressionMatch m = row.match(text);
            if (m.hasMatch())
                rows.insert(m.captured(1),
                            QStringList{m.captured(2), m.captured(3), m.captured(4), m.captured(5), m.captured(6)}
                                .join(u' ')
                                .trimmed());
        }
        return rows;
    }

    // The JUnit file is valid against the schema CI servers read.
    static void ExpectValidJUnit(const QString &path)
    {
        if (!testutil::HaveProgram(u"xmllint"_s))
            return;
        QByteArray lint;
        EXPECT_EQ(testutil::RunProgram(u"xmllint"_s,
                                       {u"--noout"_s, u"--schema"_s, testutil::DataPath(u"junit/junit.xsd"_s), path},
                                       &lint),
                  0)
            << lint.constData();
    }

    static QDomElement ReadXml(const QString &path)
    {
        QDomDocument doc;
        EXPECT_TRUE(doc.setContent(testutil::ReadFile(path))) << path.toStdString();
        return doc.documentElement();
    }

    // What is left installed on a handset besides the framework folder.
    QStringList Installed(const QString &handset) const
    {
        QStringList left
            = QDir(handsets + u'/' + handset + u"/fs/usermods"_s).entryList(QDir::AllEntries | QDir::NoDotAndDotDot);
        left.removeAll(u"CTF"_s);
        return left;
    }

    QTemporaryDir dir;
    QString root;
    QString handsets;
    QString targets;
    QString results;
    QString testData;
    QProcessEnvironment env;
};

TEST_F(DemoRun, ReportsEveryModuleOfThisRunWithItsHandsetTimesAndLogs)
{
    const QString junit = dir.filePath(u"junit.xml"_s);
    const QString json = dir.filePath(u"summary.json"_s);
    const ToolResult r = Tool({u"run"_s, u"--test-data"_s, testData, u"--junit"_s, junit, u"--json"_s, json});
    EXPECT_EQ(r.status, 1) << r.err.constData(); // some demo test cases fail on purpose
    const QMap<QString, QString> rows = Rows(r.out);
    EXPECT_EQ(rows.value(u"ITimer"_s), u"demo-phone 3 1 1 0"_s) << r.out.constData();
    EXPECT_EQ(rows.value(u"IClock"_s), u"demo-phone 3 0 0 0"_s);
    EXPECT_EQ(rows.value(u"Widgets"_s), u"demo-phone 2 1 0 0"_s);
    EXPECT_EQ(rows.value(u"OatAudio"_s), u"demo-phone 2 1 1 0"_s);
    EXPECT_EQ(rows.value(u"Sockets"_s), u"demo-phone 2 1 1 0"_s);
    EXPECT_EQ(rows.value(u"PlatformVersion"_s), u"demo-phone 2 0 0 0"_s);
    EXPECT_TRUE(r.out.contains("Total (6 modules)"));
    EXPECT_TRUE(QFile::exists(results));

    ExpectValidJUnit(junit);
    const QDomElement suites = ReadXml(junit);
    EXPECT_EQ(suites.attribute(u"failures"_s), u"4"_s);
    EXPECT_EQ(suites.attribute(u"errors"_s), u"0"_s);
    const QDomElement timer = suites.elementsByTagName(u"testsuite"_s).at(1).toElement();
    EXPECT_EQ(timer.attribute(u"name"_s), u"ITimer"_s);
    EXPECT_EQ(timer.attribute(u"hostname"_s), u"demo-phone"_s);
    EXPECT_FALSE(timer.attribute(u"timestamp"_s).isEmpty());
    const QString message = timer.elementsByTagName(u"failure"_s).at(0).toElement().attribute(u"message"_s);
    EXPECT_TRUE(message.contains(u"Test: Expiry / Result: FAIL"_s)) << message.toStdString();
    EXPECT_TRUE(message.contains(u"/Logs/ITimer-"_s)) << message.toStdString();
    // The unit test log gives each test case's time.
    const QDomElement sockets = suites.elementsByTagName(u"testsuite"_s).at(5).toElement();
    EXPECT_EQ(sockets.firstChildElement(u"testcase"_s).attribute(u"time"_s), u"0.007"_s);

    const QJsonObject summary = QJsonDocument::fromJson(testutil::ReadFile(json)).object();
    EXPECT_FALSE(summary.value(u"start"_s).toString().isEmpty());
    EXPECT_EQ(summary.value(u"handsets"_s).toArray().at(0).toString(), u"demo-phone"_s);
    const QJsonObject first = summary.value(u"modules"_s).toArray().at(0).toObject();
    EXPECT_TRUE(QFile::exists(first.value(u"logs"_s).toArray().at(0).toString()));
    EXPECT_GE(first.value(u"durationMs"_s).toInteger(-1), 0);

    // "-" is standard output, and the summary then goes to standard error.
    const ToolResult toOutput = Tool({u"run"_s, u"IClock"_s, u"--json"_s, u"-"_s});
    EXPECT_EQ(toOutput.status, 0) << toOutput.err.constData();
    EXPECT_EQ(QJsonDocument::fromJson(toOutput.out).object().value(u"totals"_s).toObject().value(u"passed"_s).toInt(),
              3)
        << toOutput.out.constData();
    EXPECT_FALSE(QFile::exists(dir.filePath(u"-"_s)));
}

TEST_F(DemoRun, AHandsetLostMidRunReportsErrorsNotAnEarlierRunsVerdicts)
{
    ASSERT_EQ(Tool({u"run"_s}).status, 1); // a history where every module ran
    AddToIni(u"demo-phone"_s, "offlineAfter=12\n");
    const QString junit = dir.filePath(u"junit.xml"_s);
    const ToolResult lost = Tool({u"run"_s, u"--junit"_s, junit});
    EXPECT_EQ(lost.status, 1) << lost.err.constData();
    const QMap<QString, QString> rows = Rows(lost.out);
    EXPECT_EQ(rows.size(), 6) << lost.out.constData();
    EXPECT_EQ(rows.value(u"PlatformVersion"_s), u"0 0 0 2"_s) << lost.out.constData();
    EXPECT_TRUE(lost.out.contains("Not finished: IClock on demo-phone: handset lost")) << lost.out.constData();
    EXPECT_TRUE(lost.out.contains("Not finished: Sockets: not run: every handset was lost"));
    ExpectValidJUnit(junit);
    const QDomElement suites = ReadXml(junit);
    EXPECT_EQ(suites.attribute(u"errors"_s), u"21"_s);
    EXPECT_EQ(suites.elementsByTagName(u"skipped"_s).size(), 0);
    EXPECT_EQ(suites.elementsByTagName(u"error"_s).at(0).toElement().attribute(u"message"_s), u"handset lost"_s);
}

TEST_F(DemoRun, AnInterruptedRunEndsTheModuleInHandAndReportsTheRest)
{
    const QString junit = dir.filePath(u"junit.xml"_s);
    env.insert(u"KESTIX_TIME_SCALE"_s, u"0.2"_s); // time to stop it mid-run
    for (const int stops : {1, 2}) {
        SCOPED_TRACE(stops);
        QProcess tool;
        tool.setProcessEnvironment(env);
        tool.setWorkingDirectory(dir.path());
        tool.start(QStringLiteral(HARNESS_BINARY_DIR "/harness"),
                   WithLog({u"run"_s, u"--verbose"_s, u"--junit"_s, junit}));
        tool.setReadChannel(QProcess::StandardError);
        ASSERT_TRUE(tool.waitForStarted());
        // Stop as soon as the first module is under way.
        QByteArray err;
        const auto readUntil = [&](const char *text) {
            while (!err.contains(text) && tool.state() == QProcess::Running) {
                tool.waitForReadyRead(5000);
                err += tool.readAllStandardError();
            }
        };
        readUntil("Running KVK test");
        ASSERT_GT(tool.processId(), 0) << err.constData();
        ::kill(pid_t(tool.processId()), SIGINT);
        if (stops == 2) {
            readUntil("signal again");
            ::kill(pid_t(tool.processId()), SIGINT);
        }
        ASSERT_TRUE(tool.waitForFinished(60000));
        EXPECT_EQ(tool.exitCode(), 130);
        const QByteArray out = tool.readAllStandardOutput();
        QDomDocument history;
        if (QFile::exists(results)) {
            EXPECT_TRUE(history.setContent(testutil::ReadFile(results)));
        }
        if (stops == 2) {
            EXPECT_FALSE(out.contains("Total (")) << out.constData();
            continue;
        }
        EXPECT_TRUE(out.contains("interrupted before it ran")) << out.constData() << err.constData();
        EXPECT_TRUE(QString::fromUtf8(out).contains(QRegularExpression(u"\nIClock +demo-phone +3 +0 +0 +0\n"_s)));
        EXPECT_EQ(Installed(u"demo-phone"_s), QStringList());
        ExpectValidJUnit(junit);
        EXPECT_GT(ReadXml(junit).attribute(u"errors"_s).toInt(), 0);
        QFile::remove(junit);
    }
}

TEST_F(DemoRun, OneRunAtATimeOnAHandsetUnlessAskedToWait)
{
    QLockFile held(targets + u"/demo-phone/run.lock"_s);
    ASSERT_TRUE(QDir().mkpath(targets + u"/demo-phone"_s));
    ASSERT_TRUE(held.tryLock(0));
    const ToolResult busy = Tool({u"run"_s, u"IClock"_s});
    EXPECT_EQ(busy.status, 2);
    EXPECT_TRUE(busy.err.contains(
        u"handset demo-phone is in use by process %1"_s.arg(QCoreApplication::applicationPid()).toUtf8()))
        << busy.err.constData();
    EXPECT_FALSE(busy.out.contains("Total"));

    QProcess waiting;
    waiting.setProcessEnvironment(env);
    waiting.start(QStringLiteral(HARNESS_BINARY_DIR "/harness"), WithLog({u"run"_s, u"--wait"_s, u"IClock"_s}));
    waiting.setReadChannel(QProcess::StandardError);
    ASSERT_TRUE(waiting.waitForStarted());
    QByteArray err;
    while (!err.contains("waiting") && waiting.state() == QProcess::Running) {
        waiting.waitForReadyRead(5000);
        err += waiting.readAllStandardError();
    }
    held.unlock();
    ASSERT_TRUE(waiting.waitForFinished(60000));
    EXPECT_EQ(waiting.exitCode(), 0) << err.constData() << waiting.readAllStandardError().constData();
}

TEST_F(DemoRun, TheNamedHandsetIsTheOneUsed)
{
    AddHandset(u"demo-phone2"_s);
    const ToolResult exact = Tool({u"run"_s, u"--target"_s, u"demo-phone"_s, u"IClock"_s});
    EXPECT_EQ(exact.status, 0) << exact.err.constData();
    EXPECT_EQ(Rows(exact.out).value(u"IClock"_s), u"demo-phone 3 0 0 0"_s);

    const ToolResult several = Tool({u"run"_s, u"--target"_s, u"phone"_s, u"IClock"_s});
    EXPECT_EQ(several.status, 2);
    EXPECT_TRUE(several.err.contains("'phone' matches several handsets: demo-phone, demo-phone2"))
        << several.err.constData();

    testutil::WriteFile(handsets + u"/demo-phone/offline"_s, "");
    const ToolResult offline = Tool({u"run"_s, u"--target"_s, u"demo-phone"_s, u"IClock"_s});
    EXPECT_EQ(offline.status, 2);
    EXPECT_TRUE(offline.err.contains("handset demo-phone is offline")) << offline.err.constData();
    EXPECT_FALSE(QFileInfo::exists(targets + u"/demo-phone2/Logs/ProcessedResults/ProcessedResults.xml"_s));
}

TEST_F(DemoRun, AnUnreadableHistoryIsSaidOutLoud)
{
    ASSERT_EQ(Tool({u"run"_s, u"IClock"_s}).status, 0);
    testutil::WriteFile(results, testutil::ReadFile(results).left(60));
    const ToolResult retry = Tool({u"run"_s, u"--retry"_s});
    EXPECT_EQ(retry.status, 2);
    EXPECT_TRUE(retry.err.contains("cannot retry: the processed results of demo-phone are unreadable"))
        << retry.err.constData();

    const ToolResult run = Tool({u"run"_s, u"IClock"_s});
    EXPECT_EQ(run.status, 0) << run.err.constData();
    const QRegularExpressionMatch kept = QRegularExpression(u"were kept as (\\S+)"_s).match(QString::fromUtf8(run.out));
    ASSERT_TRUE(kept.hasMatch()) << run.out.constData();
    EXPECT_EQ(testutil::ReadFile(kept.captured(1)).size(), 60);
}

TEST_F(DemoRun, SetUpFailuresAndBadFiltersAreRefusedBeforeAnythingRuns)
{
    const QString missing = dir.filePath(u"missing/file"_s);
    testutil::WriteFile(dir.filePath(u"a-file"_s), "x");
    QDir().mkpath(dir.filePath(u"empty"_s));
    const struct
    {
        QStringList arguments;
        const char *variable;
        QString value;
        const char *error;
    } rows[] = {
        {{u"run"_s, u"--test-data"_s, missing}, nullptr, {}, "--test-data: "},
        {{u"run"_s, u"--dpk"_s, missing}, nullptr, {}, "--dpk: "},
        {{u"run"_s}, "KESTIX_TOOLSET", missing, "tool set"},
        {{u"run"_s, u"--run-option"_s, u"bogus"_s}, nullptr, {}, "unknown --run-option 'bogus'"},
        {{u"run"_s, u"--features"_s, missing}, nullptr, {}, "feature list"},
        {{u"run"_s}, "KESTIX_DATA_ROOT", dir.filePath(u"a-file"_s), "is not a folder"},
        {{u"run"_s, u"--junit"_s, missing}, nullptr, {}, "cannot write --junit"},
        {{u"run"_s, u"--json"_s, missing}, nullptr, {}, "cannot write --json"},
        {{u"run"_s, u"--copy-delay"_s, u"soon"_s}, nullptr, {}, "--copy-delay"},
        {{u"modules"_s, u"--kit"_s, u"nowhere"_s}, nullptr, {}, "no test kit 'nowhere'"},
        {{u"run"_s, u"IClock"_s, u"Nope"_s}, nullptr, {}, "no module matches 'Nope'"},
        {{u"run"_s, u"--family"_s, u"media"_s, u"I*"_s}, nullptr, {}, "no module matches 'I*' in family 'media'"},
        {{u"run"_s, u"--subfamily"_s, u"timer"_s}, nullptr, {}, "--subfamily needs --family"},
        {{u"run"_s, u"--test-cases"_s, u"Nope,ReadClock"_s, u"IClock"_s}, nullptr, {}, "has no test case 'Nope'"},
        {{u"run"_s, u"--target"_s, u"no-such-phone"_s}, nullptr, {}, "no handset matching 'no-such-phone'"},
        {{u"run"_s}, "KESTIX_HANDSETS", dir.filePath(u"empty"_s), "no handset attached"},
        {{u"process"_s}, nullptr, {}, "--log-dir"},
        {{u"process"_s, u"--log-dir"_s, dir.filePath(u"empty"_s)}, nullptr, {}, "no logs"},
    };
    for (const auto &row : rows) {
        const QString trace = row.arguments.join(u' ') + u' ' + QLatin1String(row.variable);
        SCOPED_TRACE(trace.toStdString());
        const QProcessEnvironment saved = env;
        if (row.variable)
            env.insert(QLatin1String(row.variable), row.value);
        const ToolResult r = Tool(row.arguments);
        env = saved;
        EXPECT_EQ(r.status, 2) << r.out.constData();
        EXPECT_TRUE(r.err.contains(row.error)) << r.err.constData();
        EXPECT_EQ(r.err.count('\n'), 1) << r.err.constData(); // one line, nothing else
    }
    EXPECT_FALSE(QFileInfo::exists(targets + u"/demo-phone/Logs/ProcessedResults/ProcessedResults.xml"_s));
    EXPECT_EQ(Installed(u"demo-phone"_s), QStringList());
    // A refused kit leaves no empty cache folder behind.
    const QDir caches(root + u"/data/Norvane/TestManifests"_s);
    for (const QString &cache : caches.entryList(QDir::Dirs | QDir::NoDotAndDotDot))
        EXPECT_FALSE(QDir(caches.filePath(cache)).isEmpty()) << cache.toStdString();
}

TEST_F(DemoRun, FiltersSelectWhatTheyName)
{
    const ToolResult modules = Tool({u"modules"_s});
    ASSERT_EQ(modules.status, 0) << modules.err.constData();
    EXPECT_TRUE(modules.out.contains("ITimer\tctf\tsystem\ttimer\tKVK\t5\n")) << modules.out.constData();
    EXPECT_TRUE(modules.out.contains("PlatformVersion\tctf\tcore\tversion\tPVS\t2\n"));
    EXPECT_FALSE(modules.out.contains("Helper")); // secondary modules are never offered

    const ToolResult family = Tool({u"run"_s, u"--family"_s, u"SYSTEM"_s, u"--subfamily"_s, u"timer"_s, u"I*"_s});
    EXPECT_EQ(Rows(family.out).keys(), QStringList{u"ITimer"_s}) << family.out.constData() << family.err.constData();

    const ToolResult cases = Tool({u"run"_s, u"--test-cases"_s, u"ReadClock"_s, u"*clock"_s});
    EXPECT_EQ(cases.status, 0) << cases.err.constData();
}

TEST_F(DemoRun, RetryAndProcessWorkFromTheHistory)
{
    AddToIni(u"demo-phone"_s, "offlineAfter=40\n");
    ASSERT_EQ(Tool({u"run"_s}).status, 1);
    QFile::remove(handsets + u"/demo-phone/offline"_s);
    const QString ini = handsets + u"/demo-phone/handset.ini"_s;
    testutil::WriteFile(ini, testutil::ReadFile(ini).replace("offlineAfter=40\n", ""));
    // Every module not shown passed runs again, those the lost run never reached too.
    const ToolResult retry = Tool({u"run"_s, u"--retry"_s});
    EXPECT_EQ(retry.status, 1);
    const QMap<QString, QString> rows = Rows(retry.out);
    EXPECT_EQ(QStringList(rows.keys()), (QStringList{u"ITimer"_s, u"OatAudio"_s, u"Sockets"_s, u"Widgets"_s}))
        << retry.out.constData();

    const QString again = dir.filePath(u"again.xml"_s);
    const ToolResult process
        = Tool({u"process"_s, u"--log-dir"_s, targets + u"/demo-phone/Logs"_s, u"--results"_s, again});
    EXPECT_EQ(process.status, 1) << process.err.constData() << process.out.constData(); // as report: a test case failed
    EXPECT_TRUE(QString::fromUtf8(process.out).contains(QRegularExpression(u"ITimer\\s+3\\s+1\\s+1\\s+0\\n"_s)))
        << process.out.constData();
    EXPECT_TRUE(QFile::exists(again));
}

TEST_F(DemoRun, ManifestKeepsBothCatalogues)
{
    const QString folder = dir.filePath(u"catalogues"_s);
    const ToolResult r = Tool({u"manifest"_s, u"-o"_s, folder});
    EXPECT_EQ(r.status, 0) << r.err.constData();
    const QDomElement kit = ReadXml(folder + u"/KVKManifest.xml"_s);
    const QDomElement platform = ReadXml(folder + u"/PlatformManifest.xml"_s);
    EXPECT_TRUE(testutil::ReadFile(folder + u"/KVKManifest.xml"_s).contains("ITimer"));
    EXPECT_TRUE(testutil::ReadFile(folder + u"/PlatformManifest.xml"_s).contains("PlatformVersion"));

    const ToolResult file = Tool({u"manifest"_s, u"-o"_s, dir.filePath(u"harness.log"_s)});
    EXPECT_EQ(file.status, 2);
}

TEST_F(DemoRun, SharedRunsNameTheHandsetOfEachModule)
{
    AddHandset(u"demo-phone2"_s, "offlineAfter=1\n"); // lost with a module in hand
    AddHandset(u"demo-phone3"_s);
    testutil::WriteFile(handsets + u"/demo-phone3/offline"_s, "");
    const ToolResult r = Tool({u"run"_s, u"--verbose"_s, u"--all-targets"_s, u"--test-data"_s, testData});
    EXPECT_EQ(r.status, 1) << r.err.constData() << r.out.constData();
    // Every progress line and every library line names its handset.
    const QString out = QString::fromUtf8(r.out);
    EXPECT_EQ(out.count(QRegularExpression(u"^\\[[1-6]/6\\] demo-phone  "_s, QRegularExpression::MultilineOption)), 6)
        << r.out.constData();
    EXPECT_TRUE(out.contains(u"handset lost; the module goes back to the queue"_s)) << r.out.constData();
    EXPECT_TRUE(r.err.contains("\ndemo-phone: Running KVK test ITimer")) << r.err.constData();
    EXPECT_TRUE(r.err.contains("\ndemo-phone2: Running ")) << r.err.constData();
    const QMap<QString, QString> rows = Rows(r.out);
    EXPECT_EQ(rows.value(u"ITimer"_s), u"demo-phone 3 1 1 0"_s) << r.out.constData();
    EXPECT_EQ(rows.value(u"OatAudio"_s), u"demo-phone 2 1 1 0"_s);
    EXPECT_EQ(rows.size(), 6);
    EXPECT_TRUE(r.out.contains("Handset demo-phone2 dropped out at ")) << r.out.constData();
    EXPECT_TRUE(r.out.contains("Handset demo-phone3 could not be connected"));
}

TEST_F(DemoRun, RunAndProcessTakeTheKitPlatformAndLogTheyAreGiven)
{
    // Without the variables there is no kit; the options name it instead.
    const QString kit = env.value(u"KESTIX_TESTSET"_s);
    const QString platform = env.value(u"KESTIX_PLATFORM"_s);
    for (const QString &name :
         {u"KESTIX_TESTSET"_s, u"KESTIX_PLATFORM"_s, u"KESTIX_TESTSETS_ALL"_s, u"KESTIX_PLATFORMS_ALL"_s})
        env.remove(name);
    const QString log = dir.filePath(u"given.log"_s);
    EXPECT_EQ(RunTool({u"run"_s, u"IClock"_s}, env, dir.path()).status, 2);
    const ToolResult run = RunTool(
        {u"run"_s, u"--kit"_s, kit, u"--platform"_s, platform, u"--log"_s, log, u"IClock"_s, u"PlatformVersion"_s}, env,
        dir.path());
    EXPECT_EQ(run.status, 0) << run.err.constData();
    EXPECT_EQ(Rows(run.out).size(), 2) << run.out.constData(); // a kit module and a platform module
    EXPECT_TRUE(testutil::ReadFile(log).contains("Running KVK test IClock"));

    const QString logs = targets + u"/demo-phone/Logs"_s;
    const QString processLog = dir.filePath(u"process.log"_s);
    const ToolResult process = RunTool(
        {u"process"_s, u"--kit"_s, kit, u"--platform"_s, platform, u"--log"_s, processLog, u"--log-dir"_s, logs}, env,
        dir.path());
    EXPECT_EQ(process.status, 0) << process.err.constData();
    EXPECT_TRUE(testutil::ReadFile(processLog).contains("Process Complete"));
}

TEST_F(DemoRun, ShardsOfOneSelectionMergeIntoTheVerdictsOfOneRun)
{
    // The plan touches no handset.
    const ToolResult plan = Tool({u"run"_s, u"--plan"_s, u"--shard-count"_s, u"2"_s});
    EXPECT_EQ(plan.status, 0) << plan.err.constData();
    EXPECT_TRUE(plan.out.contains("Shard 0 of 2") && plan.out.contains("Shard 1 of 2")) << plan.out.constData();
    EXPECT_FALSE(QFile::exists(results));
    EXPECT_EQ(Tool({u"run"_s, u"--shard-index"_s, u"2"_s, u"--shard-count"_s, u"2"_s}).status, 2);

    // Shard 0 as Bazel starts it, shard 1 by option on another handset.
    AddHandset(u"other-phone"_s);
    const QString status = dir.filePath(u"shard-status"_s);
    QProcessEnvironment bazel = env;
    bazel.insert(u"TEST_SHARD_INDEX"_s, u"0"_s);
    bazel.insert(u"TEST_TOTAL_SHARDS"_s, u"2"_s);
    bazel.insert(u"TEST_SHARD_STATUS_FILE"_s, status);
    const ToolResult first
        = RunTool(WithLog({u"run"_s, u"--target"_s, u"demo-phone"_s, u"--test-data"_s, testData}), bazel, dir.path());
    EXPECT_LE(first.status, 1) << first.err.constData();
    EXPECT_TRUE(QFile::exists(status));
    const ToolResult second = Tool({u"run"_s, u"--target"_s, u"other-phone"_s, u"--test-data"_s, testData,
                                    u"--shard-index"_s, u"1"_s, u"--shard-count"_s, u"2"_s});
    EXPECT_LE(second.status, 1) << second.err.constData();
    EXPECT_EQ(Rows(first.out).size() + Rows(second.out).size(), 6);

    const QString otherResults = targets + u"/other-phone/Logs/ProcessedResults/ProcessedResults.xml"_s;
    const QString timings = dir.filePath(u"timings.json"_s);
    const ToolResult merged
        = Tool({u"report"_s, u"--merge"_s, results, otherResults, u"--expect-all"_s, u"--save-timings"_s, timings});
    EXPECT_EQ(merged.status, 1) << merged.err.constData(); // the demo's failures
    const QMap<QString, QString> rows = Rows(merged.out);
    EXPECT_EQ(rows.size(), 6) << merged.out.constData();
    EXPECT_EQ(rows.value(u"ITimer"_s).section(u' ', 1), u"3 1 1 0"_s);
    EXPECT_EQ(rows.value(u"OatAudio"_s).section(u' ', 1), u"2 1 1 0"_s);
    EXPECT_EQ(rows.value(u"PlatformVersion"_s).section(u' ', 1), u"2 0 0 0"_s);
    // Each shard's module times came along, and plan the next split.
    const ToolResult balanced = Tool({u"run"_s, u"--plan"_s, u"--shard-count"_s, u"2"_s, u"--timings"_s, timings});
    EXPECT_EQ(balanced.status, 0) << balanced.err.constData();
    EXPECT_TRUE(balanced.out.contains(" ms")) << balanced.out.constData();

    // A shard that never reported leaves its modules not run.
    const ToolResult half = Tool({u"report"_s, u"--merge"_s, results, u"--expect-all"_s});
    EXPECT_EQ(half.status, 1);
    EXPECT_EQ(Rows(half.out).size(), 6) << half.out.constData();
    EXPECT_TRUE(half.out.contains("not run by any shard")) << half.out.constData();
}

// ---- What a run shows while it runs and afterwards. ----

// The tool on a terminal: "script" gives it one; everything it wrote, both
// streams. Empty when there is no "script" here.
QByteArray OnTerminal(const QStringList &arguments, const QProcessEnvironment &env, const QString &folder)
{
    if (!testutil::HaveProgram(u"script"_s))
        return {};
    QStringList quoted{QStringLiteral(HARNESS_BINARY_DIR "/harness")};
    for (const QString &argument : arguments)
        quoted.append(u'\'' + argument + u'\'');
    QProcess tool;
    tool.setProcessEnvironment(env);
    tool.setWorkingDirectory(folder);
    tool.start(u"script"_s, {u"-q"_s, u"-e"_s, u"-c"_s, quoted.join(u' '), u"/dev/null"_s});
    tool.closeWriteChannel();
    if (!tool.waitForFinished(120000))
        return {};
    return tool.readAll();
}

// Makes the ITimer module of the demo kit one that never completes its log:
// its package is taken apart and put together again with tar.
void HangITimer(const QString &root)
{
    const QString folder = root + u"/kits/DemoKit/tests/system/timer/ITimer/package"_s;
    const QString package = folder + u"/ITimer_Win32_Release.kestix"_s;
    const QString work = folder + u"/unpacked"_s;
    ASSERT_TRUE(QDir().mkpath(work));
    ASSERT_EQ(testutil::RunProgram(u"tar"_s, {u"-xf"_s, package, u"-C"_s, work}), 0);
    const QString behaviour = work + u"/itimer/behaviour"_s;
    QByteArray script = testutil::ReadFile(behaviour);
    ASSERT_TRUE(script.contains("echo '[/VERBOSE]'\n"));
    testutil::WriteFile(behaviour, script.replace("echo '[/VERBOSE]'\n", ""));
    ASSERT_EQ(testutil::RunProgram(u"tar"_s, {u"-cf"_s, package, u"-C"_s, work, u"itimer"_s}), 0);
    QDir(work).removeRecursively();
}

TEST_F(DemoRun, ProgressShowsOneLinePerModuleAndColourOnlyOnATerminal)
{
    const ToolResult r = Tool({u"run"_s, u"--test-data"_s, testData});
    EXPECT_EQ(r.status, 1) << r.err.constData();
    const QString out = QString::fromUtf8(r.out);
    static const QRegularExpression timer(
        u"\n\\[[1-6]/6\\] demo-phone  ITimer +3 passed 1 failed 1 unsupported  \\d+\\.\\d s\n"_s);
    EXPECT_TRUE(out.contains(timer)) << r.out.constData();
    EXPECT_EQ(out.count(QRegularExpression(u"^\\[[1-6]/6\\] demo-phone  "_s, QRegularExpression::MultilineOption)), 6);
    EXPECT_TRUE(
        out.contains(QRegularExpression(u"Total \\(6 modules\\).*\nElapsed: \\d+\\.\\d s\nSlowest: \\w+ \\d"_s)));
    EXPECT_FALSE(r.out.contains('\033'));
    // The library's own messages stay in its log unless asked for.
    EXPECT_FALSE(r.out.contains("Running KVK test") || r.err.contains("Running KVK test")) << r.err.constData();
    EXPECT_TRUE(testutil::ReadFile(dir.filePath(u"harness.log"_s)).contains("Running KVK test"));
    const ToolResult verbose = Tool({u"run"_s, u"--verbose"_s, u"IClock"_s});
    EXPECT_TRUE(verbose.err.contains("Running KVK test IClock")) << verbose.err.constData();
    EXPECT_FALSE(verbose.err.contains("\n\n"));

    const QStringList arguments = WithLog({u"run"_s, u"ITimer"_s});
    const QByteArray coloured = OnTerminal(arguments, env, dir.path());
    if (coloured.isEmpty())
        GTEST_SKIP() << "no terminal to try colour on ('script' is missing or did not run)";
    EXPECT_TRUE(coloured.contains("\033[32m3 passed\033[0m \033[31m1 failed\033[0m")) << coloured.constData();
    QProcessEnvironment plain = env;
    plain.insert(u"NO_COLOR"_s, u"1"_s);
    const QByteArray noColour = OnTerminal(arguments, plain, dir.path());
    EXPECT_TRUE(noColour.contains("ITimer  3 passed 1 failed 1 unsupported")) << noColour.constData();
    EXPECT_FALSE(noColour.contains("\033[3"));
}

TEST_F(DemoRun, AModulePastItsTimeoutIsStoppedRemovedAndReportedWhileTheRunGoesOn)
{
    HangITimer(root);
    const QString junit = dir.filePath(u"junit.xml"_s);
    // 150 s on the library's clock: instant at time scale 0.
    const QStringList arguments{u"run"_s, u"--timeout"_s, u"150"_s, u"--junit"_s, junit, u"ITimer"_s, u"IClock"_s};
    const ToolResult r = Tool(arguments);
    EXPECT_EQ(r.status, 1) << r.err.constData();
    EXPECT_TRUE(r.out.contains("Not finished: ITimer on demo-phone: stopped after its time limit of 150 s"))
        << r.out.constData();
    EXPECT_EQ(Rows(r.out).value(u"IClock"_s), u"demo-phone 3 0 0 0"_s);
    // Off a terminal, a long module shows it is alive once a minute.
    const QString out = QString::fromUtf8(r.out);
    EXPECT_EQ(out.count(QRegularExpression(QStringLiteral(
                  R"(\n\[\.\.\.\] demo-phone  ITimer  still running: waiting for its log, [12] min \d+ s\n)"))),
              2)
        << r.out.constData();
    EXPECT_EQ(Installed(u"demo-phone"_s), QStringList());
    ExpectValidJUnit(junit);
    EXPECT_EQ(ReadXml(junit).attribute(u"errors"_s), u"5"_s);

    // On a terminal the same wait is a status line rewritten in place.
    const QByteArray terminal = OnTerminal(WithLog({u"run"_s, u"--timeout"_s, u"20"_s, u"ITimer"_s}), env, dir.path());
    if (testutil::HaveProgram(u"script"_s)) {
        EXPECT_TRUE(QString::fromUtf8(terminal).contains(
            QRegularExpression(u"\r\033\\[KITimer on demo-phone: waiting for its log, 1\\d s"_s)))
            << terminal.constData();
        EXPECT_FALSE(terminal.contains("still running"));
    }

    for (const char *bad : {"0", "-3", "soon", "1e9"}) {
        const ToolResult refused = Tool({u"run"_s, u"--timeout"_s, QLatin1String(bad)});
        EXPECT_EQ(refused.status, 2) << bad;
        EXPECT_TRUE(refused.err.contains("--timeout needs a number of seconds")) << refused.err.constData();
    }
}

TEST_F(DemoRun, ADryRunSaysWhatWouldRunWhereAndInWhichOrderAndTouchesNothing)
{
    ASSERT_EQ(Tool({u"run"_s, u"IClock"_s}).status, 0);
    const QByteArray before = testutil::ReadFile(results);
    AddHandset(u"demo-phone2"_s);
    // Not even an offline handset is a reason to stop: nothing is connected.
    testutil::WriteFile(handsets + u"/demo-phone2/offline"_s, "");
    const ToolResult r = Tool({u"run"_s, u"--dry-run"_s, u"--retry"_s, u"--timeout"_s, u"90"_s, u"--target"_s,
                               u"demo-phone"_s, u"--target"_s, u"demo-phone2"_s});
    EXPECT_EQ(r.status, 0) << r.err.constData();
    EXPECT_EQ(QString::fromUtf8(r.out),
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
    EXPECT_EQ(testutil::ReadFile(results), before);
    EXPECT_FALSE(QFileInfo::exists(targets + u"/demo-phone2/Logs/ProcessedResults/ProcessedResults.xml"_s));
    EXPECT_FALSE(QFileInfo::exists(targets + u"/demo-phone/run.lock"_s));
    EXPECT_EQ(Installed(u"demo-phone"_s), QStringList());
}

TEST_F(DemoRun, TheHtmlReportOfARunCutShortShowsItsNotRunModules)
{
    AddToIni(u"demo-phone"_s, "offlineAfter=12\n");
    const QString html = dir.filePath(u"out/report.html"_s);
    QDir().mkpath(dir.filePath(u"out"_s));
    const ToolResult r = Tool({u"run"_s, u"--html"_s, html});
    EXPECT_EQ(r.status, 1) << r.err.constData();
    EXPECT_TRUE(r.out.contains("HTML report: " + html.toUtf8() + "\n")) << r.out.constData();
    const QString page = QString::fromUtf8(testutil::ReadFile(html));
    EXPECT_TRUE(page.contains(u"<b data-count=\"not finished\">6</b>"_s)) << page.toStdString();
    EXPECT_TRUE(page.contains(u"Not finished: not run: every handset was lost"_s));
    EXPECT_EQ(page.count(u"<tr class=\"module\""_s), 6);
    EXPECT_EQ(page.count(u"<span class=\"outcome notfinished\">not finished</span>"_s), 6);
    // Self-contained: its style is inline and nothing is fetched from anywhere.
    EXPECT_TRUE(page.contains(u"<style>"_s));
    EXPECT_FALSE(page.contains(QRegularExpression(u"(src|href)=\"(https?:|//)"_s)));
    // A run's page has the columns of a run; the history's has not (below).
    EXPECT_TRUE(page.contains(u">Duration</th>"_s));
}

TEST_F(DemoRun, TheHtmlReportEscapesNamesAndSaysThatNoHistoryIsRecorded)
{
    const QString file = dir.filePath(u"results.xml"_s);
    testutil::WriteFile(
        file,
        "<testmodules><module name=\"&lt;script&gt;alert(1)&lt;/script&gt;\" family=\"a&amp;b\" source=\"KVK\">"
        "<testcase name=\"&lt;img src=x onerror=alert(2)&gt;\" result=\"fail\"/></module></testmodules>");
    const QString html = dir.filePath(u"history.html"_s);
    const ToolResult r = RunTool({u"report"_s, file, u"--html"_s, html}, env, dir.path());
    EXPECT_EQ(r.status, 1) << r.err.constData();
    const QString page = QString::fromUtf8(testutil::ReadFile(html));
    EXPECT_TRUE(page.contains(u"&lt;script&gt;alert(1)&lt;/script&gt;"_s)) << page.toStdString();
    EXPECT_TRUE(page.contains(u"&lt;img src=x onerror=alert(2)&gt;"_s));
    EXPECT_TRUE(page.contains(u"a&amp;b"_s));
    EXPECT_FALSE(page.contains(u"<script>alert"_s));
    EXPECT_FALSE(page.contains(u"<img"_s));
    EXPECT_EQ(page.count(u"<script>"_s), 1); // the page's own
    EXPECT_TRUE(page.contains(u"no history across runs is recorded"_s));
    EXPECT_FALSE(page.contains(u">Duration</th>"_s));
}

// Headless Chromium renders the report of a run shared by two handsets.
TEST_F(DemoRun, TheHtmlReportWorksInARealBrowser)
{
    QString chromium = QStandardPaths::findExecutable(u"chromium"_s);
    if (chromium.isEmpty())
        GTEST_SKIP()
            << "headless browser test skipped: no 'chromium' on PATH (./run installs Debian's chromium package)";
    AddHandset(u"demo-phone2"_s);
    const QString html = dir.filePath(u"report.html"_s);
    const ToolResult r = Tool({u"run"_s, u"--all-targets"_s, u"--test-data"_s, testData, u"--html"_s, html});
    ASSERT_EQ(r.status, 1) << r.err.constData();

    // Every link is a relative one to a copied log, or one within the page.
    const QString page = QString::fromUtf8(testutil::ReadFile(html));
    int logLinks = 0;
    static const QRegularExpression link(u"href=\"([^\"]*)\""_s);
    for (QRegularExpressionMatchIterator it = link.globalMatch(page); it.hasNext();) {
        const QString target = it.next().captured(1);
        if (target.startsWith(u'#'))
            continue;
        EXPECT_TRUE(target.startsWith(u"demo/data/Norvane/Targets/demo-phone"_s)) << target.toStdString();
        EXPECT_TRUE(QFileInfo(dir.filePath(QUrl::fromPercentEncoding(target.toUtf8()))).isFile())
            << target.toStdString();
        ++logLinks;
    }
    EXPECT_GE(logLinks, 7); // Sockets has two

    QTemporaryDir profile;
    ASSERT_TRUE(profile.isValid());
    // The page after its script ran; standard error holds its console.
    const auto browse = [&](const QStringList &what, const QString &fragment, QByteArray &err) {
        QProcess browser;
        browser.start(chromium,
                      QStringList{u"--headless"_s, u"--no-sandbox"_s, u"--disable-gpu"_s, u"--disable-quic"_s,
                                  u"--no-first-run"_s, u"--disable-background-networking"_s,
                                  u"--disable-component-update"_s, u"--disable-sync"_s,
                                  u"--user-data-dir="_s + profile.path(), u"--enable-logging=stderr"_s, u"--v=0"_s}
                          + what + QStringList{QUrl::fromLocalFile(html).toString() + fragment});
        if (!browser.waitForFinished(120000) || browser.exitCode() != 0) {
            browser.kill();
            browser.waitForFinished();
            return QByteArray();
        }
        err = browser.readAllStandardError();
        return browser.readAllStandardOutput();
    };
    QByteArray console;
    const QString dom = QString::fromUtf8(browse({u"--dump-dom"_s}, QString(), console));
    if (dom.isEmpty())
        GTEST_SKIP() << "headless browser test skipped: chromium did not run here: " << console.constData();
    // The page writes nothing to the console: any line there is an error.
    for (const QByteArray &line : console.split('\n'))
        EXPECT_FALSE(line.contains(":CONSOLE")) << line.constData();
    EXPECT_TRUE(dom.contains(u"<b data-count=\"passed\">14</b>"_s)) << dom.toStdString();
    EXPECT_TRUE(dom.contains(u"<b data-count=\"failed\">4</b>"_s));
    EXPECT_TRUE(dom.contains(u"<b data-count=\"unsupported\">3</b>"_s));
    EXPECT_EQ(dom.count(u"<g class=\"lane\""_s), 2);
    EXPECT_EQ(dom.count(u"<rect class=\"module "_s), 6);
    EXPECT_TRUE(dom.contains(u"data-filter=\"all\""_s));
    EXPECT_FALSE(dom.contains(u"hidden=\"\""_s));

    // "#failures" in the address leaves only the modules with a failure.
    const QString failures = QString::fromUtf8(browse({u"--dump-dom"_s}, u"#failures"_s, console));
    EXPECT_TRUE(failures.contains(u"data-filter=\"failures\""_s)) << failures.toStdString();
    static const QRegularExpression row(
        u"<tr class=\"module\" data-module=\"(\\w+)\" data-ok=\"(\\d)\"( hidden=\"\")?>"_s);
    int shown = 0;
    for (QRegularExpressionMatchIterator it = row.globalMatch(failures); it.hasNext();) {
        const QRegularExpressionMatch m = it.next();
        EXPECT_EQ(m.captured(3).isEmpty(), m.captured(2) == u"0"_s) << m.captured(0).toStdString();
        shown += m.captured(3).isEmpty() ? 1 : 0;
    }
    EXPECT_EQ(shown, 4);

    const QString shot = dir.filePath(u"report.png"_s);
    browse({u"--screenshot="_s + shot, u"--window-size=1280,1600"_s}, QString(), console);
    EXPECT_TRUE(testutil::ReadFile(shot).startsWith("\x89PNG"));
}

} // namespace
