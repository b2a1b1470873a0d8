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
#include <QTemporaryDir>
#include <QThread>

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
        root = dir.filePath(QStringLiteral("demo"));
        const ToolResult init = RunTool({QStringLiteral("demo"), QStringLiteral("init"), root});
        ASSERT_EQ(init.status, 0) << init.err.constData();
        env = QProcessEnvironment::systemEnvironment();
        static const QRegularExpression line(QStringLiteral("^export (\\w+)='(.*)'$"));
        for (const QString &text : QString::fromUtf8(init.out).split(QLatin1Char('\n'), Qt::SkipEmptyParts)) {
            const QRegularExpressionMatch m = line.match(text);
            ASSERT_TRUE(m.hasMatch()) << text.toStdString();
            env.insert(m.captured(1), m.captured(2));
        }
        env.insert(QStringLiteral("KESTIX_TIME_SCALE"), QStringLiteral("0"));
        handsets = env.value(QStringLiteral("KESTIX_HANDSETS"));
        targets = root + QStringLiteral("/data/Norvane/Targets");
        results = targets + QStringLiteral("/demo-phone/Logs/ProcessedResults/ProcessedResults.xml");
        testData = root + QStringLiteral("/testdata/demo.ksx");
    }

    QStringList WithLog(QStringList arguments) const
    {
        arguments.insert(1, QStringLiteral("--log"));
        arguments.insert(2, dir.filePath(QStringLiteral("harness.log")));
        return arguments;
    }

    ToolResult Tool(const QStringList &arguments) { return RunTool(WithLog(arguments), env, dir.path()); }

    // Handsets beside the demo's own, with its settings plus extra lines.
    void AddHandset(const QString &name, const QByteArray &extra = QByteArray())
    {
        ASSERT_TRUE(QDir().mkpath(handsets + QLatin1Char('/') + name + QStringLiteral("/fs")));
        testutil::WriteFile(handsets + QLatin1Char('/') + name + QStringLiteral("/handset.ini"),
                            testutil::ReadFile(handsets + QStringLiteral("/demo-phone/handset.ini")) + extra);
    }
    void AddToIni(const QString &name, const QByteArray &extra)
    {
        const QString ini = handsets + QLatin1Char('/') + name + QStringLiteral("/handset.ini");
        testutil::WriteFile(ini, testutil::ReadFile(ini) + extra);
    }

    // Module name -> "handset passed failed unsupported unexecuted" of its summary row.
    static QMap<QString, QString> Rows(const QByteArray &out)
    {
        QMap<QString, QString> rows;
        static const QRegularExpression row(QStringLiteral("^(\\w+)\\s+([\\w-]*)\\s+(\\d+)\\s+(\\d+)\\s+(\\d+)\\s+(\\d+)$"));
        for (const QString &text : QString::fromUtf8(out).split(QLatin1Char('\n'))) {
            const QRegularExpressionMatch m = row.match(text);
            if (m.hasMatch())
                rows.insert(m.captured(1), QStringList{m.captured(2), m.captured(3), m.captured(4), m.captured(5), m.captured(6)}
                                               .join(QLatin1Char(' ')).trimmed());
        }
        return rows;
    }

    // The JUnit file is valid against the schema CI servers read.
    static void ExpectValidJUnit(const QString &path)
    {
        if (!testutil::HaveProgram(QStringLiteral("xmllint")))
            return;
        QByteArray lint;
        EXPECT_EQ(testutil::RunProgram(QStringLiteral("xmllint"),
                                       {QStringLiteral("--noout"), QStringLiteral("--schema"),
                                        testutil::DataPath(QStringLiteral("junit/junit.xsd")), path}, &lint), 0)
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
        QStringList left = QDir(handsets + QLatin1Char('/') + handset + QStringLiteral("/fs/usermods"))
                               .entryList(QDir::AllEntries | QDir::NoDotAndDotDot);
        left.removeAll(QStringLiteral("CTF"));
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
    const QString junit = dir.filePath(QStringLiteral("junit.xml"));
    const QString json = dir.filePath(QStringLiteral("summary.json"));
    const ToolResult r = Tool({QStringLiteral("run"), QStringLiteral("--test-data"), testData,
                               QStringLiteral("--junit"), junit, QStringLiteral("--json"), json});
    EXPECT_EQ(r.status, 1) << r.err.constData();  // some demo test cases fail on purpose
    const QMap<QString, QString> rows = Rows(r.out);
    EXPECT_EQ(rows.value(QStringLiteral("ITimer")), QStringLiteral("demo-phone 3 1 1 0")) << r.out.constData();
    EXPECT_EQ(rows.value(QStringLiteral("IClock")), QStringLiteral("demo-phone 3 0 0 0"));
    EXPECT_EQ(rows.value(QStringLiteral("Widgets")), QStringLiteral("demo-phone 2 1 0 0"));
    EXPECT_EQ(rows.value(QStringLiteral("OatAudio")), QStringLiteral("demo-phone 2 1 1 0"));
    EXPECT_EQ(rows.value(QStringLiteral("Sockets")), QStringLiteral("demo-phone 2 1 1 0"));
    EXPECT_EQ(rows.value(QStringLiteral("PlatformVersion")), QStringLiteral("demo-phone 2 0 0 0"));
    EXPECT_TRUE(r.out.contains("Total (6 modules)"));
    EXPECT_TRUE(QFile::exists(results));

    ExpectValidJUnit(junit);
    const QDomElement suites = ReadXml(junit);
    EXPECT_EQ(suites.attribute(QStringLiteral("failures")), QStringLiteral("4"));
    EXPECT_EQ(suites.attribute(QStringLiteral("errors")), QStringLiteral("0"));
    const QDomElement timer = suites.elementsByTagName(QStringLiteral("testsuite")).at(1).toElement();
    EXPECT_EQ(timer.attribute(QStringLiteral("name")), QStringLiteral("ITimer"));
    EXPECT_EQ(timer.attribute(QStringLiteral("hostname")), QStringLiteral("demo-phone"));
    EXPECT_FALSE(timer.attribute(QStringLiteral("timestamp")).isEmpty());
    const QString message = timer.elementsByTagName(QStringLiteral("failure")).at(0).toElement().attribute(QStringLiteral("message"));
    EXPECT_TRUE(message.contains(QLatin1String("Test: Expiry / Result: FAIL"))) << message.toStdString();
    EXPECT_TRUE(message.contains(QLatin1String("/Logs/ITimer-"))) << message.toStdString();

    const QJsonObject summary = QJsonDocument::fromJson(testutil::ReadFile(json)).object();
    EXPECT_FALSE(summary.value(QStringLiteral("start")).toString().isEmpty());
    EXPECT_EQ(summary.value(QStringLiteral("handsets")).toArray().at(0).toString(), QStringLiteral("demo-phone"));
    const QJsonObject first = summary.value(QStringLiteral("modules")).toArray().at(0).toObject();
    EXPECT_TRUE(QFile::exists(first.value(QStringLiteral("logs")).toArray().at(0).toString()));
    EXPECT_GE(first.value(QStringLiteral("durationMs")).toInteger(-1), 0);

    // "-" is standard output, and the summary then goes to standard error.
    const ToolResult toOutput = Tool({QStringLiteral("run"), QStringLiteral("IClock"), QStringLiteral("--json"), QStringLiteral("-")});
    EXPECT_EQ(toOutput.status, 0) << toOutput.err.constData();
    EXPECT_EQ(QJsonDocument::fromJson(toOutput.out).object().value(QStringLiteral("totals")).toObject().value(QStringLiteral("passed")).toInt(), 3)
        << toOutput.out.constData();
    EXPECT_FALSE(QFile::exists(dir.filePath(QStringLiteral("-"))));
}

TEST_F(DemoRun, AHandsetLostMidRunReportsErrorsNotAnEarlierRunsVerdicts)
{
    ASSERT_EQ(Tool({QStringLiteral("run")}).status, 1);  // a history where every module ran
    AddToIni(QStringLiteral("demo-phone"), "offlineAfter=12\n");
    const QString junit = dir.filePath(QStringLiteral("junit.xml"));
    const ToolResult lost = Tool({QStringLiteral("run"), QStringLiteral("--junit"), junit});
    EXPECT_EQ(lost.status, 1) << lost.err.constData();
    const QMap<QString, QString> rows = Rows(lost.out);
    EXPECT_EQ(rows.size(), 6) << lost.out.constData();
    EXPECT_EQ(rows.value(QStringLiteral("PlatformVersion")), QStringLiteral("0 0 0 2")) << lost.out.constData();
    EXPECT_TRUE(lost.out.contains("Not finished: IClock on demo-phone: handset lost")) << lost.out.constData();
    EXPECT_TRUE(lost.out.contains("Not finished: Sockets: not run: every handset was lost"));
    ExpectValidJUnit(junit);
    const QDomElement suites = ReadXml(junit);
    EXPECT_EQ(suites.attribute(QStringLiteral("errors")), QStringLiteral("21"));
    EXPECT_EQ(suites.elementsByTagName(QStringLiteral("skipped")).size(), 0);
    EXPECT_EQ(suites.elementsByTagName(QStringLiteral("error")).at(0).toElement().attribute(QStringLiteral("message")),
              QStringLiteral("handset lost"));
}

TEST_F(DemoRun, AnInterruptedRunEndsTheModuleInHandAndReportsTheRest)
{
    const QString junit = dir.filePath(QStringLiteral("junit.xml"));
    env.insert(QStringLiteral("KESTIX_TIME_SCALE"), QStringLiteral("0.2"));  // time to stop it mid-run
    for (const int stops : {1, 2}) {
        SCOPED_TRACE(stops);
        QProcess tool;
        tool.setProcessEnvironment(env);
        tool.setWorkingDirectory(dir.path());
        tool.start(QStringLiteral(HARNESS_BINARY_DIR "/harness"),
                   WithLog({QStringLiteral("run"), QStringLiteral("--junit"), junit}));
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
        EXPECT_TRUE(QString::fromUtf8(out).contains(QRegularExpression(QStringLiteral("\nIClock +demo-phone +3 +0 +0 +0\n"))));
        EXPECT_EQ(Installed(QStringLiteral("demo-phone")), QStringList());
        ExpectValidJUnit(junit);
        EXPECT_GT(ReadXml(junit).attribute(QStringLiteral("errors")).toInt(), 0);
        QFile::remove(junit);
    }
}

TEST_F(DemoRun, OneRunAtATimeOnAHandsetUnlessAskedToWait)
{
    QLockFile held(targets + QStringLiteral("/demo-phone/run.lock"));
    ASSERT_TRUE(QDir().mkpath(targets + QStringLiteral("/demo-phone")));
    ASSERT_TRUE(held.tryLock(0));
    const ToolResult busy = Tool({QStringLiteral("run"), QStringLiteral("IClock")});
    EXPECT_EQ(busy.status, 2);
    EXPECT_TRUE(busy.err.contains(QStringLiteral("handset demo-phone is in use by process %1").arg(QCoreApplication::applicationPid()).toUtf8()))
        << busy.err.constData();
    EXPECT_FALSE(busy.out.contains("Total"));

    QProcess waiting;
    waiting.setProcessEnvironment(env);
    waiting.start(QStringLiteral(HARNESS_BINARY_DIR "/harness"), WithLog({QStringLiteral("run"), QStringLiteral("--wait"), QStringLiteral("IClock")}));
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
    AddHandset(QStringLiteral("demo-phone2"));
    const ToolResult exact = Tool({QStringLiteral("run"), QStringLiteral("--target"), QStringLiteral("demo-phone"), QStringLiteral("IClock")});
    EXPECT_EQ(exact.status, 0) << exact.err.constData();
    EXPECT_EQ(Rows(exact.out).value(QStringLiteral("IClock")), QStringLiteral("demo-phone 3 0 0 0"));

    const ToolResult several = Tool({QStringLiteral("run"), QStringLiteral("--target"), QStringLiteral("phone"), QStringLiteral("IClock")});
    EXPECT_EQ(several.status, 2);
    EXPECT_TRUE(several.err.contains("'phone' matches several handsets: demo-phone, demo-phone2")) << several.err.constData();

    testutil::WriteFile(handsets + QStringLiteral("/demo-phone/offline"), "");
    const ToolResult offline = Tool({QStringLiteral("run"), QStringLiteral("--target"), QStringLiteral("demo-phone"), QStringLiteral("IClock")});
    EXPECT_EQ(offline.status, 2);
    EXPECT_TRUE(offline.err.contains("handset demo-phone is offline")) << offline.err.constData();
    EXPECT_FALSE(QFileInfo::exists(targets + QStringLiteral("/demo-phone2/Logs/ProcessedResults/ProcessedResults.xml")));
}

TEST_F(DemoRun, AnUnreadableHistoryIsSaidOutLoud)
{
    ASSERT_EQ(Tool({QStringLiteral("run"), QStringLiteral("IClock")}).status, 0);
    testutil::WriteFile(results, testutil::ReadFile(results).left(60));
    const ToolResult retry = Tool({QStringLiteral("run"), QStringLiteral("--retry")});
    EXPECT_EQ(retry.status, 2);
    EXPECT_TRUE(retry.err.contains("cannot retry: the processed results of demo-phone are unreadable")) << retry.err.constData();

    const ToolResult run = Tool({QStringLiteral("run"), QStringLiteral("IClock")});
    EXPECT_EQ(run.status, 0) << run.err.constData();
    const QRegularExpressionMatch kept = QRegularExpression(QStringLiteral("were kept as (\\S+)")).match(QString::fromUtf8(run.out));
    ASSERT_TRUE(kept.hasMatch()) << run.out.constData();
    EXPECT_EQ(testutil::ReadFile(kept.captured(1)).size(), 60);
}

TEST_F(DemoRun, SetUpFailuresAndBadFiltersAreRefusedBeforeAnythingRuns)
{
    const QString missing = dir.filePath(QStringLiteral("missing/file"));
    testutil::WriteFile(dir.filePath(QStringLiteral("a-file")), "x");
    QDir().mkpath(dir.filePath(QStringLiteral("empty")));
    const struct {
        QStringList arguments;
        const char *variable;
        QString value;
        const char *error;
    } rows[] = {
        {{QStringLiteral("run"), QStringLiteral("--test-data"), missing}, nullptr, {}, "--test-data: "},
        {{QStringLiteral("run"), QStringLiteral("--dpk"), missing}, nullptr, {}, "--dpk: "},
        {{QStringLiteral("run")}, "KESTIX_TOOLSET", missing, "tool set"},
        {{QStringLiteral("run"), QStringLiteral("--run-option"), QStringLiteral("bogus")}, nullptr, {}, "unknown --run-option 'bogus'"},
        {{QStringLiteral("run"), QStringLiteral("--features"), missing}, nullptr, {}, "feature list"},
        {{QStringLiteral("run")}, "KESTIX_DATA_ROOT", dir.filePath(QStringLiteral("a-file")), "is not a folder"},
        {{QStringLiteral("run"), QStringLiteral("--junit"), missing}, nullptr, {}, "cannot write --junit"},
        {{QStringLiteral("run"), QStringLiteral("--json"), missing}, nullptr, {}, "cannot write --json"},
        {{QStringLiteral("run"), QStringLiteral("--copy-delay"), QStringLiteral("soon")}, nullptr, {}, "--copy-delay"},
        {{QStringLiteral("modules"), QStringLiteral("--kit"), QStringLiteral("nowhere")}, nullptr, {}, "no test kit 'nowhere'"},
        {{QStringLiteral("run"), QStringLiteral("IClock"), QStringLiteral("Nope")}, nullptr, {}, "no module matches 'Nope'"},
        {{QStringLiteral("run"), QStringLiteral("--family"), QStringLiteral("media"), QStringLiteral("I*")}, nullptr, {}, "no module matches 'I*' in family 'media'"},
        {{QStringLiteral("run"), QStringLiteral("--subfamily"), QStringLiteral("timer")}, nullptr, {}, "--subfamily needs --family"},
        {{QStringLiteral("run"), QStringLiteral("--test-cases"), QStringLiteral("Nope,ReadClock"), QStringLiteral("IClock")}, nullptr, {}, "has no test case 'Nope'"},
        {{QStringLiteral("run"), QStringLiteral("--target"), QStringLiteral("no-such-phone")}, nullptr, {}, "no handset matching 'no-such-phone'"},
        {{QStringLiteral("run")}, "KESTIX_HANDSETS", dir.filePath(QStringLiteral("empty")), "no handset attached"},
        {{QStringLiteral("process")}, nullptr, {}, "--log-dir"},
        {{QStringLiteral("process"), QStringLiteral("--log-dir"), dir.filePath(QStringLiteral("empty"))}, nullptr, {}, "no logs"},
    };
    for (const auto &row : rows) {
        const QString trace = row.arguments.join(QLatin1Char(' ')) + QLatin1Char(' ') + QLatin1String(row.variable);
        SCOPED_TRACE(trace.toStdString());
        const QProcessEnvironment saved = env;
        if (row.variable)
            env.insert(QLatin1String(row.variable), row.value);
        const ToolResult r = Tool(row.arguments);
        env = saved;
        EXPECT_EQ(r.status, 2) << r.out.constData();
        EXPECT_TRUE(r.err.contains(row.error)) << r.err.constData();
        EXPECT_EQ(r.err.count('\n'), 1) << r.err.constData();  // one line, nothing else
    }
    EXPECT_FALSE(QFileInfo::exists(targets + QStringLiteral("/demo-phone/Logs/ProcessedResults/ProcessedResults.xml")));
    EXPECT_EQ(Installed(QStringLiteral("demo-phone")), QStringList());
    // A refused kit leaves no empty cache folder behind.
    const QDir caches(root + QStringLiteral("/data/Norvane/TestManifests"));
    for (const QString &cache : caches.entryList(QDir::Dirs | QDir::NoDotAndDotDot))
        EXPECT_FALSE(QDir(caches.filePath(cache)).isEmpty()) << cache.toStdString();
}

TEST_F(DemoRun, FiltersSelectWhatTheyName)
{
    const ToolResult modules = Tool({QStringLiteral("modules")});
    ASSERT_EQ(modules.status, 0) << modules.err.constData();
    EXPECT_TRUE(modules.out.contains("ITimer\tctf\tsystem\ttimer\tKVK\t5\n")) << modules.out.constData();
    EXPECT_TRUE(modules.out.contains("PlatformVersion\tctf\tcore\tversion\tPVS\t2\n"));
    EXPECT_FALSE(modules.out.contains("Helper"));  // secondary modules are never offered

    const ToolResult family = Tool({QStringLiteral("run"), QStringLiteral("--family"), QStringLiteral("SYSTEM"),
                                    QStringLiteral("--subfamily"), QStringLiteral("timer"), QStringLiteral("I*")});
    EXPECT_EQ(Rows(family.out).keys(), QStringList{QStringLiteral("ITimer")}) << family.out.constData() << family.err.constData();

    const ToolResult cases = Tool({QStringLiteral("run"), QStringLiteral("--test-cases"), QStringLiteral("ReadClock"), QStringLiteral("*clock")});
    EXPECT_EQ(cases.status, 0) << cases.err.constData();
}

TEST_F(DemoRun, RetryAndProcessWorkFromTheHistory)
{
    AddToIni(QStringLiteral("demo-phone"), "offlineAfter=40\n");
    ASSERT_EQ(Tool({QStringLiteral("run")}).status, 1);
    QFile::remove(handsets + QStringLiteral("/demo-phone/offline"));
    const QString ini = handsets + QStringLiteral("/demo-phone/handset.ini");
    testutil::WriteFile(ini, testutil::ReadFile(ini).replace("offlineAfter=40\n", ""));
    // Every module not shown passed runs again, those the lost run never reached too.
    const ToolResult retry = Tool({QStringLiteral("run"), QStringLiteral("--retry")});
    EXPECT_EQ(retry.status, 1);
    const QMap<QString, QString> rows = Rows(retry.out);
    EXPECT_EQ(QStringList(rows.keys()), (QStringList{QStringLiteral("ITimer"), QStringLiteral("OatAudio"),
                                                    QStringLiteral("Sockets"), QStringLiteral("Widgets")}))
        << retry.out.constData();

    const QString again = dir.filePath(QStringLiteral("again.xml"));
    const ToolResult process = Tool({QStringLiteral("process"), QStringLiteral("--log-dir"), targets + QStringLiteral("/demo-phone/Logs"),
                                     QStringLiteral("--results"), again});
    EXPECT_EQ(process.status, 1) << process.err.constData() << process.out.constData();  // as report: a test case failed
    EXPECT_TRUE(QString::fromUtf8(process.out).contains(QRegularExpression(QStringLiteral("ITimer\\s+3\\s+1\\s+1\\s+0\\n")))) << process.out.constData();
    EXPECT_TRUE(QFile::exists(again));
}

TEST_F(DemoRun, ManifestKeepsBothCatalogues)
{
    const QString folder = dir.filePath(QStringLiteral("catalogues"));
    const ToolResult r = Tool({QStringLiteral("manifest"), QStringLiteral("-o"), folder});
    EXPECT_EQ(r.status, 0) << r.err.constData();
    const QDomElement kit = ReadXml(folder + QStringLiteral("/KVKManifest.xml"));
    const QDomElement platform = ReadXml(folder + QStringLiteral("/PlatformManifest.xml"));
    EXPECT_TRUE(testutil::ReadFile(folder + QStringLiteral("/KVKManifest.xml")).contains("ITimer"));
    EXPECT_TRUE(testutil::ReadFile(folder + QStringLiteral("/PlatformManifest.xml")).contains("PlatformVersion"));

    const ToolResult file = Tool({QStringLiteral("manifest"), QStringLiteral("-o"), dir.filePath(QStringLiteral("harness.log"))});
    EXPECT_EQ(file.status, 2);
}

TEST_F(DemoRun, SharedRunsNameTheHandsetOfEachModule)
{
    AddHandset(QStringLiteral("demo-phone2"), "offlineAfter=1\n");  // lost with a module in hand
    AddHandset(QStringLiteral("demo-phone3"));
    testutil::WriteFile(handsets + QStringLiteral("/demo-phone3/offline"), "");
    const ToolResult r = Tool({QStringLiteral("run"), QStringLiteral("--all-targets"), QStringLiteral("--test-data"), testData});
    EXPECT_EQ(r.status, 1) << r.err.constData() << r.out.constData();
    const QMap<QString, QString> rows = Rows(r.out);
    EXPECT_EQ(rows.value(QStringLiteral("ITimer")), QStringLiteral("demo-phone 3 1 1 0")) << r.out.constData();
    EXPECT_EQ(rows.value(QStringLiteral("OatAudio")), QStringLiteral("demo-phone 2 1 1 0"));
    EXPECT_EQ(rows.size(), 6);
    EXPECT_TRUE(r.out.contains("Handset demo-phone2 dropped out at ")) << r.out.constData();
    EXPECT_TRUE(r.out.contains("Handset demo-phone3 could not be connected"));
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
    const ToolResult first = RunTool(WithLog({u"run"_s, u"--target"_s, u"demo-phone"_s, u"--test-data"_s, testData}), bazel, dir.path());
    EXPECT_LE(first.status, 1) << first.err.constData();
    EXPECT_TRUE(QFile::exists(status));
    const ToolResult second = Tool({u"run"_s, u"--target"_s, u"other-phone"_s, u"--test-data"_s, testData,
                                    u"--shard-index"_s, u"1"_s, u"--shard-count"_s, u"2"_s});
    EXPECT_LE(second.status, 1) << second.err.constData();
    EXPECT_EQ(Rows(first.out).size() + Rows(second.out).size(), 6);

    const QString otherResults = targets + u"/other-phone/Logs/ProcessedResults/ProcessedResults.xml"_s;
    const QString timings = dir.filePath(u"timings.json"_s);
    const ToolResult merged = Tool({u"report"_s, u"--merge"_s, results, otherResults, u"--expect-all"_s,
                                    u"--save-timings"_s, timings});
    EXPECT_EQ(merged.status, 1) << merged.err.constData();  // the demo's failures
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

} // namespace
