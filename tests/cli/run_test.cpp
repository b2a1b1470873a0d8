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
        static const QRegularExpression row(
            QStringLiteral("^(\\w+)\\s+([\\w-]*)\\s+(\\d+)\\s+(\\d+)\\s+(\\d+)\\s+(\\d+)$"));
        for (const QString &text : QString::fromUtf8(out).split(QLatin1Char('\n'))) {
            const QRegularExpressionMatch m = row.match(text);
            if (m.hasMatch())
                rows.insert(m.captured(1),
                            QStringList{m.captured(2), m.captured(3), m.captured(4), m.captured(5), m.captured(6)}
                                .join(QLatin1Char(' '))
                                .trimmed());
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
                                        testutil::DataPath(QStringLiteral("junit/junit.xsd")), path},
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
    EXPECT_EQ(r.status, 1) << r.err.constData(); // some demo test cases fail on purpose
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
    const QString message
        = timer.elementsByTagName(QStringLiteral("failure")).at(0).toElement().attribute(QStringLiteral("message"));
    EXPECT_TRUE(message.contains(QLatin1String("Test: Expiry / Result: FAIL"))) << message.toStdString();
    EXPECT_TRUE(message.contains(QLatin1String("/Logs/ITimer-"))) << message.toStdString();
    // The unit test log gives each test case's time.
    const QDomElement sockets = suites.elementsByTagName(QStringLiteral("testsuite")).at(5).toElement();
    EXPECT_EQ(sockets.firstChildElement(QStringLiteral("testcase")).attribute(QStringLiteral("time")),
              QStringLiteral("0.007"));

    const QJsonObject summary = QJsonDocument::fromJson(testutil::ReadFile(json)).object();
    EXPECT_FALSE(summary.value(QStringLiteral("start")).toString().isEmpty());
    EXPECT_EQ(summary.value(QStringLiteral("handsets")).toArray().at(0).toString(), QStringLiteral("demo-phone"));
    const QJsonObject first = summary.value(QStringLiteral("modules")).toArray().at(0).toObject();
    EXPECT_TRUE(QFile::exists(first.value(QStringLiteral("logs")).toArray().at(0).toString()));
    EXPECT_GE(first.value(QStringLiteral("durationMs")).toInteger(-1), 0);

    // "-" is standard output, and the summary then goes to standard error.
    const ToolResult toOutput
        = Tool({QStringLiteral("run"), QStringLiteral("IClock"), QStringLiteral("--json"), QStringLiteral("-")});
    EXPECT_EQ(toOutput.status, 0) << toOutput.err.constData();
    EXPECT_EQ(QJsonDocument::fromJson(toOutput.out)
                  .object()
                  .value(QStringLiteral("totals"))
                  .toObject()
                  .value(QStringLiteral("passed"))
                  .toInt(),
              3)
        << toOutput.out.constData();
    EXPECT_FALSE(QFile::exists(dir.filePath(QStringLiteral("-"))));
}

TEST_F(DemoRun, AHandsetLostMidRunReportsErrorsNotAnEarlierRunsVerdicts)
{
    ASSERT_EQ(Tool({QStringLiteral("run")}).status, 1); // a history where every module ran
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
    env.insert(QStringLiteral("KESTIX_TIME_SCALE"), QStringLiteral("0.2")); // time to stop it mid-run
    for (const int stops : {1, 2}) {
        SCOPED_TRACE(stops);
        QProcess tool;
        tool.setProcessEnvironment(env);
        tool.setWorkingDirectory(dir.path());
        tool.start(QStringLiteral(HARNESS_BINARY_DIR "/harness"),
                   WithLog({QStringLiteral("run"), QStringLiteral("--verbose"), QStringLiteral("--junit"), junit}));
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
        EXPECT_TRUE(
            QString::fromUtf8(out).contains(QRegularExpression(QStringLiteral("\nIClock +demo-phone +3 +0 +0 +0\n"))));
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
    EXPECT_TRUE(busy.err.contains(
        QStringLiteral("handset demo-phone is in use by process %1").arg(QCoreApplication::applicationPid()).toUtf8()))
        << busy.err.constData();
    EXPECT_FALSE(busy.out.contains("Total"));

    QProcess waiting;
    waiting.setProcessEnvironment(env);
    waiting.start(QStringLiteral(HARNESS_BINARY_DIR "/harness"),
                  WithLog({QStringLiteral("run"), QStringLiteral("--wait"), QStringLiteral("IClock")}));
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
    const ToolResult exact = Tool(
        {QStringLiteral("run"), QStringLiteral("--target"), QStringLiteral("demo-phone"), QStringLiteral("IClock")});
    EXPECT_EQ(exact.status, 0) << exact.err.constData();
    EXPECT_EQ(Rows(exact.out).value(QStringLiteral("IClock")), QStringLiteral("demo-phone 3 0 0 0"));

    const ToolResult several
        = Tool({QStringLiteral("run"), QStringLiteral("--target"), QStringLiteral("phone"), QStringLiteral("IClock")});
    EXPECT_EQ(several.status, 2);
    EXPECT_TRUE(several.err.contains("'phone' matches several handsets: demo-phone, demo-phone2"))
        << several.err.constData();

    testutil::WriteFile(handsets + QStringLiteral("/demo-phone/offline"), "");
    const ToolResult offline = Tool(
        {QStringLiteral("run"), QStringLiteral("--target"), QStringLiteral("demo-phone"), QStringLiteral("IClock")});
    EXPECT_EQ(offline.status, 2);
    EXPECT_TRUE(offline.err.contains("handset demo-phone is offline")) << offline.err.constData();
    EXPECT_FALSE(
        QFileInfo::exists(targets + QStringLiteral("/demo-phone2/Logs/ProcessedResults/ProcessedResults.xml")));
}

TEST_F(DemoRun, AnUnreadableHistoryIsSaidOutLoud)
{
    ASSERT_EQ(Tool({QStringLiteral("run"), QStringLiteral("IClock")}).status, 0);
    testutil::WriteFile(results, testutil::ReadFile(results).left(60));
    const ToolResult retry = Tool({QStringLiteral("run"), QStringLiteral("--retry")});
    EXPECT_EQ(retry.status, 2);
    EXPECT_TRUE(retry.err.contains("cannot retry: the processed results of demo-phone are unreadable"))
        << retry.err.constData();

    const ToolResult run = Tool({QStringLiteral("run"), QStringLiteral("IClock")});
    EXPECT_EQ(run.status, 0) << run.err.constData();
    const QRegularExpressionMatch kept
        = QRegularExpression(QStringLiteral("were kept as (\\S+)")).match(QString::fromUtf8(run.out));
    ASSERT_TRUE(kept.hasMatch()) << run.out.constData();
    EXPECT_EQ(testutil::ReadFile(kept.captured(1)).size(), 60);
}

TEST_F(DemoRun, SetUpFailuresAndBadFiltersAreRefusedBeforeAnythingRuns)
{
    const QString missing = dir.filePath(QStringLiteral("missing/file"));
    testutil::WriteFile(dir.filePath(QStringLiteral("a-file")), "x");
    QDir().mkpath(dir.filePath(QStringLiteral("empty")));
    const struct
    {
        QStringList arguments;
        const char *variable;
        QString value;
        const char *error;
    } rows[] = {
        {{QStringLiteral("run"), QStringLiteral("--test-data"), missing}, nullptr, {}, "--test-data: "},
        {{QStringLiteral("run"), QStringLiteral("--dpk"), missing}, nullptr, {}, "--dpk: "},
        {{QStringLiteral("run")}, "KESTIX_TOOLSET", missing, "tool set"},
        {{QStringLiteral("run"), QStringLiteral("--run-option"), QStringLiteral("bogus")},
         nullptr,
         {},
         "unknown --run-option 'bogus'"},
        {{QStringLiteral("run"), QStringLiteral("--features"), missing}, nullptr, {}, "feature list"},
        {{QStringLiteral("run")}, "KESTIX_DATA_ROOT", dir.filePath(QStringLiteral("a-file")), "is not a folder"},
        {{QStringLiteral("run"), QStringLiteral("--junit"), missing}, nullptr, {}, "cannot write --junit"},
        {{QStringLiteral("run"), QStringLiteral("--json"), missing}, nullptr, {}, "cannot write --json"},
        {{QStringLiteral("run"), QStringLiteral("--copy-delay"), QStringLiteral("soon")}, nullptr, {}, "--copy-delay"},
        {{QStringLiteral("modules"), QStringLiteral("--kit"), QStringLiteral("nowhere")},
         nullptr,
         {},
         "no test kit 'nowhere'"},
        {{QStringLiteral("run"), QStringLiteral("IClock"), QStringLiteral("Nope")},
         nullptr,
         {},
         "no module matches 'Nope'"},
        {{QStringLiteral("run"), QStringLiteral("--family"), QStringLiteral("media"), QStringLiteral("I*")},
         nullptr,
         {},
         "no module matches 'I*' in family 'media'"},
        {{QStringLiteral("run"), QStringLiteral("--subfamily"), QStringLiteral("timer")},
         nullptr,
         {},
         "--subfamily needs --family"},
        {{QStringLiteral("run"), QStringLiteral("--test-cases"), QStringLiteral("Nope,ReadClock"),
          QStringLiteral("IClock")},
         nullptr,
         {},
         "has no test case 'Nope'"},
        {{QStringLiteral("run"), QStringLiteral("--target"), QStringLiteral("no-such-phone")},
         nullptr,
         {},
         "no handset matching 'no-such-phone'"},
        {{QStringLiteral("run")}, "KESTIX_HANDSETS", dir.filePath(QStringLiteral("empty")), "no handset attached"},
        {{QStringLiteral("process")}, nullptr, {}, "--log-dir"},
        {{QStringLiteral("process"), QStringLiteral("--log-dir"), dir.filePath(QStringLiteral("empty"))},
         nullptr,
         {},
         "no logs"},
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
        EXPECT_EQ(r.err.count('\n'), 1) << r.err.constData(); // one line, nothing else
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
    EXPECT_FALSE(modules.out.contains("Helper")); // secondary modules are never offered

    const ToolResult family = Tool({QStringLiteral("run"), QStringLiteral("--family"), QStringLiteral("SYSTEM"),
                                    QStringLiteral("--subfamily"), QStringLiteral("timer"), QStringLiteral("I*")});
    EXPECT_EQ(Rows(family.out).keys(), QStringList{QStringLiteral("ITimer")})
        << family.out.constData() << family.err.constData();

    const ToolResult cases = Tool(
        {QStringLiteral("run"), QStringLiteral("--test-cases"), QStringLiteral("ReadClock"), QStringLiteral("*clock")});
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
    EXPECT_EQ(QStringList(rows.keys()),
              (QStringList{QStringLiteral("ITimer"), QStringLiteral("OatAudio"), QStringLiteral("Sockets"),
                           QStringLiteral("Widgets")}))
        << retry.out.constData();

    const QString again = dir.filePath(QStringLiteral("again.xml"));
    const ToolResult process = Tool({QStringLiteral("process"), QStringLiteral("--log-dir"),
                                     targets + QStringLiteral("/demo-phone/Logs"), QStringLiteral("--results"), again});
    EXPECT_EQ(process.status, 1) << process.err.constData() << process.out.constData(); // as report: a test case failed
    EXPECT_TRUE(
        QString::fromUtf8(process.out).contains(QRegularExpression(QStringLiteral("ITimer\\s+3\\s+1\\s+1\\s+0\\n"))))
        << process.out.constData();
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

    const ToolResult file
        = Tool({QStringLiteral("manifest"), QStringLiteral("-o"), dir.filePath(QStringLiteral("harness.log"))});
    EXPECT_EQ(file.status, 2);
}

TEST_F(DemoRun, SharedRunsNameTheHandsetOfEachModule)
{
    AddHandset(QStringLiteral("demo-phone2"), "offlineAfter=1\n"); // lost with a module in hand
    AddHandset(QStringLiteral("demo-phone3"));
    testutil::WriteFile(handsets + QStringLiteral("/demo-phone3/offline"), "");
    const ToolResult r = Tool({QStringLiteral("run"), QStringLiteral("--verbose"), QStringLiteral("--all-targets"),
                               QStringLiteral("--test-data"), testData});
    EXPECT_EQ(r.status, 1) << r.err.constData() << r.out.constData();
    // Every progress line and every library line names its handset.
    const QString out = QString::fromUtf8(r.out);
    EXPECT_EQ(out.count(QRegularExpression(QStringLiteral("^\\[[1-6]/6\\] demo-phone  "),
                                           QRegularExpression::MultilineOption)),
              6)
        << r.out.constData();
    EXPECT_TRUE(out.contains(QStringLiteral("handset lost; the module goes back to the queue"))) << r.out.constData();
    EXPECT_TRUE(r.err.contains("\ndemo-phone: Running KVK test ITimer")) << r.err.constData();
    EXPECT_TRUE(r.err.contains("\ndemo-phone2: Running ")) << r.err.constData();
    const QMap<QString, QString> rows = Rows(r.out);
    EXPECT_EQ(rows.value(QStringLiteral("ITimer")), QStringLiteral("demo-phone 3 1 1 0")) << r.out.constData();
    EXPECT_EQ(rows.value(QStringLiteral("OatAudio")), QStringLiteral("demo-phone 2 1 1 0"));
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
    if (!testutil::HaveProgram(QStringLiteral("script")))
        return {};
    QStringList quoted{QStringLiteral(HARNESS_BINARY_DIR "/harness")};
    for (const QString &argument : arguments)
        quoted.append(QLatin1Char('\'') + argument + QLatin1Char('\''));
    QProcess tool;
    tool.setProcessEnvironment(env);
    tool.setWorkingDirectory(folder);
    tool.start(QStringLiteral("script"),
               {QStringLiteral("-q"), QStringLiteral("-e"), QStringLiteral("-c"), quoted.join(QLatin1Char(' ')),
                QStringLiteral("/dev/null")});
    tool.closeWriteChannel();
    if (!tool.waitForFinished(120000))
        return {};
    return tool.readAll();
}

// Makes the ITimer module of the demo kit one that never completes its log:
// its package is taken apart and put together again with tar.
void HangITimer(const QString &root)
{
    const QString folder = root + QStringLiteral("/kits/DemoKit/tests/system/timer/ITimer/package");
    const QString package = folder + QStringLiteral("/ITimer_Win32_Release.kestix");
    const QString work = folder + QStringLiteral("/unpacked");
    ASSERT_TRUE(QDir().mkpath(work));
    ASSERT_EQ(testutil::RunProgram(QStringLiteral("tar"), {QStringLiteral("-xf"), package, QStringLiteral("-C"), work}),
              0);
    const QString behaviour = work + QStringLiteral("/itimer/behaviour");
    QByteArray script = testutil::ReadFile(behaviour);
    ASSERT_TRUE(script.contains("echo '[/VERBOSE]'\n"));
    testutil::WriteFile(behaviour, script.replace("echo '[/VERBOSE]'\n", ""));
    ASSERT_EQ(
        testutil::RunProgram(QStringLiteral("tar"),
                             {QStringLiteral("-cf"), package, QStringLiteral("-C"), work, QStringLiteral("itimer")}),
        0);
    QDir(work).removeRecursively();
}

TEST_F(DemoRun, ProgressShowsOneLinePerModuleAndColourOnlyOnATerminal)
{
    const ToolResult r = Tool({QStringLiteral("run"), QStringLiteral("--test-data"), testData});
    EXPECT_EQ(r.status, 1) << r.err.constData();
    const QString out = QString::fromUtf8(r.out);
    static const QRegularExpression timer(
        QStringLiteral("\n\\[[1-6]/6\\] demo-phone  ITimer +3 passed 1 failed 1 unsupported  \\d+\\.\\d s\n"));
    EXPECT_TRUE(out.contains(timer)) << r.out.constData();
    EXPECT_EQ(out.count(QRegularExpression(QStringLiteral("^\\[[1-6]/6\\] demo-phone  "),
                                           QRegularExpression::MultilineOption)),
              6);
    EXPECT_TRUE(out.contains(
        QRegularExpression(QStringLiteral("Total \\(6 modules\\).*\nElapsed: \\d+\\.\\d s\nSlowest: \\w+ \\d"))));
    EXPECT_FALSE(r.out.contains('\033'));
    // The library's own messages stay in its log unless asked for.
    EXPECT_FALSE(r.out.contains("Running KVK test") || r.err.contains("Running KVK test")) << r.err.constData();
    EXPECT_TRUE(testutil::ReadFile(dir.filePath(QStringLiteral("harness.log"))).contains("Running KVK test"));
    const ToolResult verbose = Tool({QStringLiteral("run"), QStringLiteral("--verbose"), QStringLiteral("IClock")});
    EXPECT_TRUE(verbose.err.contains("Running KVK test IClock")) << verbose.err.constData();
    EXPECT_FALSE(verbose.err.contains("\n\n"));

    const QStringList arguments = WithLog({QStringLiteral("run"), QStringLiteral("ITimer")});
    const QByteArray coloured = OnTerminal(arguments, env, dir.path());
    if (coloured.isEmpty())
        GTEST_SKIP() << "no terminal to try colour on ('script' is missing or did not run)";
    EXPECT_TRUE(coloured.contains("\033[32m3 passed\033[0m \033[31m1 failed\033[0m")) << coloured.constData();
    QProcessEnvironment plain = env;
    plain.insert(QStringLiteral("NO_COLOR"), QStringLiteral("1"));
    const QByteArray noColour = OnTerminal(arguments, plain, dir.path());
    EXPECT_TRUE(noColour.contains("ITimer  3 passed 1 failed 1 unsupported")) << noColour.constData();
    EXPECT_FALSE(noColour.contains("\033[3"));
}

TEST_F(DemoRun, AModulePastItsTimeoutIsStoppedRemovedAndReportedWhileTheRunGoesOn)
{
    HangITimer(root);
    const QString junit = dir.filePath(QStringLiteral("junit.xml"));
    // 150 s on the library's clock: instant at time scale 0.
    const QStringList arguments{
        QStringLiteral("run"),    QStringLiteral("--timeout"), QStringLiteral("150"), QStringLiteral("--junit"), junit,
        QStringLiteral("ITimer"), QStringLiteral("IClock")};
    const ToolResult r = Tool(arguments);
    EXPECT_EQ(r.status, 1) << r.err.constData();
    EXPECT_TRUE(r.out.contains("Not finished: ITimer on demo-phone: stopped after its time limit of 150 s"))
        << r.out.constData();
    EXPECT_EQ(Rows(r.out).value(QStringLiteral("IClock")), QStringLiteral("demo-phone 3 0 0 0"));
    // Off a terminal, a long module shows it is alive once a minute.
    const QString out = QString::fromUtf8(r.out);
    EXPECT_EQ(out.count(QRegularExpression(QStringLiteral(
                  R"(\n\[\.\.\.\] demo-phone  ITimer  still running: waiting for its log, [12] min \d+ s\n)"))),
              2)
        << r.out.constData();
    EXPECT_EQ(Installed(QStringLiteral("demo-phone")), QStringList());
    ExpectValidJUnit(junit);
    EXPECT_EQ(ReadXml(junit).attribute(QStringLiteral("errors")), QStringLiteral("5"));

    // On a terminal the same wait is a status line rewritten in place.
    const QByteArray terminal = OnTerminal(
        WithLog({QStringLiteral("run"), QStringLiteral("--timeout"), QStringLiteral("20"), QStringLiteral("ITimer")}),
        env, dir.path());
    if (testutil::HaveProgram(QStringLiteral("script"))) {
        EXPECT_TRUE(QString::fromUtf8(terminal).contains(
            QRegularExpression(QStringLiteral("\r\033\\[KITimer on demo-phone: waiting for its log, 1\\d s"))))
            << terminal.constData();
        EXPECT_FALSE(terminal.contains("still running"));
    }

    for (const char *bad : {"0", "-3", "soon", "1e9"}) {
        const ToolResult refused = Tool({QStringLiteral("run"), QStringLiteral("--timeout"), QLatin1String(bad)});
        EXPECT_EQ(refused.status, 2) << bad;
        EXPECT_TRUE(refused.err.contains("--timeout needs a number of seconds")) << refused.err.constData();
    }
}

TEST_F(DemoRun, ADryRunSaysWhatWouldRunWhereAndInWhichOrderAndTouchesNothing)
{
    ASSERT_EQ(Tool({QStringLiteral("run"), QStringLiteral("IClock")}).status, 0);
    const QByteArray before = testutil::ReadFile(results);
    AddHandset(QStringLiteral("demo-phone2"));
    // Not even an offline handset is a reason to stop: nothing is connected.
    testutil::WriteFile(handsets + QStringLiteral("/demo-phone2/offline"), "");
    const ToolResult r
        = Tool({QStringLiteral("run"), QStringLiteral("--dry-run"), QStringLiteral("--retry"),
                QStringLiteral("--timeout"), QStringLiteral("90"), QStringLiteral("--target"),
                QStringLiteral("demo-phone"), QStringLiteral("--target"), QStringLiteral("demo-phone2")});
    EXPECT_EQ(r.status, 0) << r.err.constData();
    EXPECT_EQ(QString::fromUtf8(r.out),
              QStringLiteral("Dry run: nothing is installed or started.\n"
                             "5 modules shared by demo-phone, demo-phone2 (one queue in this order; each handset takes "
                             "the next module when it is free):\n"
                             "1. ITimer           ctf  KVK  5 test cases\n"
                             "2. PlatformVersion  ctf  PVS  2 test cases\n"
                             "3. Widgets          ctfapplet  KVK  3 test cases\n"
                             "4. OatAudio         oat  KVK  4 test cases\n"
                             "5. Sockets          uitf  KVK  4 test cases\n"
                             "--retry leaves out what the processed results show passed: IClock\n"
                             "A module still running after 90 s is stopped.\n"));
    EXPECT_EQ(testutil::ReadFile(results), before);
    EXPECT_FALSE(
        QFileInfo::exists(targets + QStringLiteral("/demo-phone2/Logs/ProcessedResults/ProcessedResults.xml")));
    EXPECT_FALSE(QFileInfo::exists(targets + QStringLiteral("/demo-phone/run.lock")));
    EXPECT_EQ(Installed(QStringLiteral("demo-phone")), QStringList());
}

TEST_F(DemoRun, TheHtmlReportOfARunCutShortShowsItsNotRunModules)
{
    AddToIni(QStringLiteral("demo-phone"), "offlineAfter=12\n");
    const QString html = dir.filePath(QStringLiteral("out/report.html"));
    QDir().mkpath(dir.filePath(QStringLiteral("out")));
    const ToolResult r = Tool({QStringLiteral("run"), QStringLiteral("--html"), html});
    EXPECT_EQ(r.status, 1) << r.err.constData();
    EXPECT_TRUE(r.out.contains("HTML report: " + html.toUtf8() + "\n")) << r.out.constData();
    const QString page = QString::fromUtf8(testutil::ReadFile(html));
    EXPECT_TRUE(page.contains(QStringLiteral("<b data-count=\"not finished\">6</b>"))) << page.toStdString();
    EXPECT_TRUE(page.contains(QStringLiteral("Not finished: not run: every handset was lost")));
    EXPECT_EQ(page.count(QStringLiteral("<tr class=\"module\"")), 6);
    EXPECT_EQ(page.count(QStringLiteral("<span class=\"outcome notfinished\">not finished</span>")), 6);
    // Self-contained: its style is inline and nothing is fetched from anywhere.
    EXPECT_TRUE(page.contains(QStringLiteral("<style>")));
    EXPECT_FALSE(page.contains(QRegularExpression(QStringLiteral("(src|href)=\"(https?:|//)"))));
    // A run's page has the columns of a run; the history's has not (below).
    EXPECT_TRUE(page.contains(QStringLiteral(">Duration</th>")));
}

TEST_F(DemoRun, TheHtmlReportEscapesNamesAndSaysThatNoHistoryIsRecorded)
{
    const QString file = dir.filePath(QStringLiteral("results.xml"));
    testutil::WriteFile(
        file,
        "<testmodules><module name=\"&lt;script&gt;alert(1)&lt;/script&gt;\" family=\"a&amp;b\" source=\"KVK\">"
        "<testcase name=\"&lt;img src=x onerror=alert(2)&gt;\" result=\"fail\"/></module></testmodules>");
    const QString html = dir.filePath(QStringLiteral("history.html"));
    const ToolResult r = RunTool({QStringLiteral("report"), file, QStringLiteral("--html"), html}, env, dir.path());
    EXPECT_EQ(r.status, 1) << r.err.constData();
    const QString page = QString::fromUtf8(testutil::ReadFile(html));
    EXPECT_TRUE(page.contains(QStringLiteral("&lt;script&gt;alert(1)&lt;/script&gt;"))) << page.toStdString();
    EXPECT_TRUE(page.contains(QStringLiteral("&lt;img src=x onerror=alert(2)&gt;")));
    EXPECT_TRUE(page.contains(QStringLiteral("a&amp;b")));
    EXPECT_FALSE(page.contains(QStringLiteral("<script>alert")));
    EXPECT_FALSE(page.contains(QStringLiteral("<img")));
    EXPECT_EQ(page.count(QStringLiteral("<script>")), 1); // the page's own
    EXPECT_TRUE(page.contains(QStringLiteral("no history across runs is recorded")));
    EXPECT_FALSE(page.contains(QStringLiteral(">Duration</th>")));
}

// Headless Chromium renders the report of a run shared by two handsets.
TEST_F(DemoRun, TheHtmlReportWorksInARealBrowser)
{
    QString chromium = QStandardPaths::findExecutable(QStringLiteral("chromium"));
    if (chromium.isEmpty())
        GTEST_SKIP()
            << "headless browser test skipped: no 'chromium' on PATH (./run installs Debian's chromium package)";
    AddHandset(QStringLiteral("demo-phone2"));
    const QString html = dir.filePath(QStringLiteral("report.html"));
    const ToolResult r = Tool({QStringLiteral("run"), QStringLiteral("--all-targets"), QStringLiteral("--test-data"),
                               testData, QStringLiteral("--html"), html});
    ASSERT_EQ(r.status, 1) << r.err.constData();

    // Every link is a relative one to a copied log, or one within the page.
    const QString page = QString::fromUtf8(testutil::ReadFile(html));
    int logLinks = 0;
    static const QRegularExpression link(QStringLiteral("href=\"([^\"]*)\""));
    for (QRegularExpressionMatchIterator it = link.globalMatch(page); it.hasNext();) {
        const QString target = it.next().captured(1);
        if (target.startsWith(QLatin1Char('#')))
            continue;
        EXPECT_TRUE(target.startsWith(QStringLiteral("demo/data/Norvane/Targets/demo-phone"))) << target.toStdString();
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
                      QStringList{QStringLiteral("--headless"), QStringLiteral("--no-sandbox"),
                                  QStringLiteral("--disable-gpu"), QStringLiteral("--disable-quic"),
                                  QStringLiteral("--no-first-run"), QStringLiteral("--disable-background-networking"),
                                  QStringLiteral("--disable-component-update"), QStringLiteral("--disable-sync"),
                                  QStringLiteral("--user-data-dir=") + profile.path(),
                                  QStringLiteral("--enable-logging=stderr"), QStringLiteral("--v=0")}
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
    const QString dom = QString::fromUtf8(browse({QStringLiteral("--dump-dom")}, QString(), console));
    if (dom.isEmpty())
        GTEST_SKIP() << "headless browser test skipped: chromium did not run here: " << console.constData();
    // The page writes nothing to the console: any line there is an error.
    for (const QByteArray &line : console.split('\n'))
        EXPECT_FALSE(line.contains(":CONSOLE")) << line.constData();
    EXPECT_TRUE(dom.contains(QStringLiteral("<b data-count=\"passed\">14</b>"))) << dom.toStdString();
    EXPECT_TRUE(dom.contains(QStringLiteral("<b data-count=\"failed\">4</b>")));
    EXPECT_TRUE(dom.contains(QStringLiteral("<b data-count=\"unsupported\">3</b>")));
    EXPECT_EQ(dom.count(QStringLiteral("<g class=\"lane\"")), 2);
    EXPECT_EQ(dom.count(QStringLiteral("<rect class=\"module ")), 6);
    EXPECT_TRUE(dom.contains(QStringLiteral("data-filter=\"all\"")));
    EXPECT_FALSE(dom.contains(QStringLiteral("hidden=\"\"")));

    // "#failures" in the address leaves only the modules with a failure.
    const QString failures
        = QString::fromUtf8(browse({QStringLiteral("--dump-dom")}, QStringLiteral("#failures"), console));
    EXPECT_TRUE(failures.contains(QStringLiteral("data-filter=\"failures\""))) << failures.toStdString();
    static const QRegularExpression row(
        QStringLiteral("<tr class=\"module\" data-module=\"(\\w+)\" data-ok=\"(\\d)\"( hidden=\"\")?>"));
    int shown = 0;
    for (QRegularExpressionMatchIterator it = row.globalMatch(failures); it.hasNext();) {
        const QRegularExpressionMatch m = it.next();
        EXPECT_EQ(m.captured(3).isEmpty(), m.captured(2) == QLatin1String("0")) << m.captured(0).toStdString();
        shown += m.captured(3).isEmpty() ? 1 : 0;
    }
    EXPECT_EQ(shown, 4);

    const QString shot = dir.filePath(QStringLiteral("report.png"));
    browse({QStringLiteral("--screenshot=") + shot, QStringLiteral("--window-size=1280,1600")}, QString(), console);
    EXPECT_TRUE(testutil::ReadFile(shot).startsWith("\x89PNG"));
}

} // namespace
