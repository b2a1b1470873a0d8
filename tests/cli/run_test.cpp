#include "cli_test.h"

#include "support/testutil.h"

#include <QDir>
#include <QDomDocument>
#include <QFile>
#include <QSet>
#include <QRegularExpression>
#include <QTemporaryDir>

#include <gtest/gtest.h>

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
        results = root + QStringLiteral("/data/Norvane/Targets/demo-phone/Logs/ProcessedResults/ProcessedResults.xml");
    }

    ToolResult Tool(QStringList arguments)
    {
        arguments.insert(1, QStringLiteral("--log"));
        arguments.insert(2, dir.filePath(QStringLiteral("harness.log")));
        return RunTool(arguments, env, dir.path());
    }

    // Module name -> its summary row (passed, failed, unsupported, unexecuted).
    static QMap<QString, QString> Rows(const QByteArray &out)
    {
        QMap<QString, QString> rows;
        static const QRegularExpression row(QStringLiteral("^(\\w+)\\s+(\\d+)\\s+(\\d+)\\s+(\\d+)\\s+(\\d+)$"));
        for (const QString &text : QString::fromUtf8(out).split(QLatin1Char('\n'))) {
            const QRegularExpressionMatch m = row.match(text);
            if (m.hasMatch())
                rows.insert(m.captured(1), QStringList{m.captured(2), m.captured(3), m.captured(4), m.captured(5)}.join(QLatin1Char(' ')));
        }
        return rows;
    }

    QTemporaryDir dir;
    QString root;
    QString results;
    QProcessEnvironment env;
};

TEST_F(DemoRun, RunsEveryModuleAndSummarisesTheVerdicts)
{
    const QString junit = dir.filePath(QStringLiteral("junit.xml"));
    const ToolResult r = Tool({QStringLiteral("run"), QStringLiteral("--test-data"), root + QStringLiteral("/testdata/demo.ksx"),
                               QStringLiteral("--junit"), junit});
    EXPECT_EQ(r.status, 1) << r.err.constData();  // some demo test cases fail on purpose
    const QMap<QString, QString> rows = Rows(r.out);
    EXPECT_EQ(rows.value(QStringLiteral("ITimer")), QStringLiteral("3 1 1 0")) << r.out.constData();
    EXPECT_EQ(rows.value(QStringLiteral("IClock")), QStringLiteral("3 0 0 0"));
    EXPECT_EQ(rows.value(QStringLiteral("Widgets")), QStringLiteral("2 1 0 0"));
    EXPECT_EQ(rows.value(QStringLiteral("OatAudio")), QStringLiteral("2 1 1 0"));
    EXPECT_EQ(rows.value(QStringLiteral("Sockets")), QStringLiteral("2 1 1 0"));
    EXPECT_EQ(rows.value(QStringLiteral("PlatformVersion")), QStringLiteral("2 0 0 0"));
    EXPECT_TRUE(QFile::exists(results));

    QDomDocument doc;
    ASSERT_TRUE(doc.setContent(testutil::ReadFile(junit)));
    EXPECT_EQ(doc.documentElement().elementsByTagName(QStringLiteral("testsuite")).size(), 6);
    EXPECT_EQ(doc.documentElement().elementsByTagName(QStringLiteral("failure")).size(), 4);
    if (testutil::HaveProgram(QStringLiteral("xmllint"))) {
        QByteArray lint;
        EXPECT_EQ(testutil::RunProgram(QStringLiteral("xmllint"), {QStringLiteral("--noout"), junit}, &lint), 0) << lint.constData();
    }
}

TEST_F(DemoRun, RetryRunsOnlyTheModulesNotPassed)
{
    ASSERT_EQ(Tool({QStringLiteral("run")}).status, 1);
    const ToolResult retry = Tool({QStringLiteral("run"), QStringLiteral("--retry")});
    EXPECT_EQ(retry.status, 1);
    const QMap<QString, QString> rows = Rows(retry.out);
    EXPECT_EQ(QStringList(rows.keys()), (QStringList{QStringLiteral("ITimer"), QStringLiteral("OatAudio"),
                                                    QStringLiteral("Sockets"), QStringLiteral("Widgets")}))
        << retry.out.constData();
    EXPECT_FALSE(retry.out.contains("Running KVK test IClock"));
}

TEST_F(DemoRun, SelectsByPatternAndFamilyAndListsModules)
{
    const ToolResult modules = Tool({QStringLiteral("modules")});
    ASSERT_EQ(modules.status, 0) << modules.err.constData();
    EXPECT_TRUE(modules.out.contains("ITimer\tctf\tsystem\ttimer\tKVK\t5\n")) << modules.out.constData();
    EXPECT_TRUE(modules.out.contains("PlatformVersion\tctf\tcore\tversion\tPVS\t2\n"));
    EXPECT_FALSE(modules.out.contains("Helper"));  // secondary modules are never offered

    const ToolResult family = Tool({QStringLiteral("modules"), QStringLiteral("--family"), QStringLiteral("SYSTEM")});
    EXPECT_EQ(family.out.count('\n'), 3) << family.out.constData();

    const ToolResult one = Tool({QStringLiteral("run"), QStringLiteral("*clock")});
    EXPECT_EQ(one.status, 0) << one.out.constData();
    EXPECT_EQ(Rows(one.out).keys(), QStringList{QStringLiteral("IClock")});
}

TEST_F(DemoRun, ProcessRebuildsTheResultsFromSavedLogs)
{
    ASSERT_EQ(Tool({QStringLiteral("run")}).status, 1);
    const QString logs = root + QStringLiteral("/data/Norvane/Targets/demo-phone/Logs");
    const QString again = dir.filePath(QStringLiteral("again.xml"));
    const ToolResult r = Tool({QStringLiteral("process"), QStringLiteral("--log-dir"), logs, QStringLiteral("--results"), again});
    ASSERT_EQ(r.status, 0) << r.err.constData() << r.out.constData();
    const QMap<QString, QString> rows = Rows(r.out);
    EXPECT_EQ(rows.value(QStringLiteral("ITimer")), QStringLiteral("3 1 1 0")) << r.out.constData();
    EXPECT_EQ(rows.value(QStringLiteral("Sockets")), QStringLiteral("2 1 1 0"));
    EXPECT_TRUE(QFile::exists(again));
}

TEST_F(DemoRun, SetupFailuresAreUsageErrors)
{
    const ToolResult noHandset = Tool({QStringLiteral("run"), QStringLiteral("--target"), QStringLiteral("no-such-phone")});
    EXPECT_EQ(noHandset.status, 2);
    EXPECT_TRUE(noHandset.err.contains("no handset")) << noHandset.err.constData();

    const ToolResult nothing = Tool({QStringLiteral("run"), QStringLiteral("NoSuchModule")});
    EXPECT_EQ(nothing.status, 2);
    EXPECT_TRUE(nothing.err.contains("no test module selected")) << nothing.err.constData();

    // No handset attached at all: nothing to share the modules among.
    const QProcessEnvironment demoEnv = env;
    env.insert(QStringLiteral("KESTIX_HANDSETS"), dir.filePath(QStringLiteral("no-handsets")));
    QDir().mkpath(dir.filePath(QStringLiteral("no-handsets")));
    const ToolResult noneAttached = Tool({QStringLiteral("run"), QStringLiteral("--all-targets")});
    EXPECT_EQ(noneAttached.status, 2);
    EXPECT_TRUE(noneAttached.err.contains("no handset attached")) << noneAttached.err.constData();
    env = demoEnv;

    EXPECT_EQ(Tool({QStringLiteral("run"), QStringLiteral("--copy-delay"), QStringLiteral("soon")}).status, 2);
    EXPECT_EQ(Tool({QStringLiteral("process")}).status, 2);

    const ToolResult manifest = Tool({QStringLiteral("manifest"), QStringLiteral("-o"), dir.filePath(QStringLiteral("catalogue.xml"))});
    EXPECT_EQ(manifest.status, 0) << manifest.err.constData();
    EXPECT_TRUE(QFile::exists(dir.filePath(QStringLiteral("catalogue.xml"))));
}

// Handsets beside the demo's own, with its settings.
void AddDemoHandsets(const QProcessEnvironment &env, const QStringList &names)
{
    const QString handsets = env.value(QStringLiteral("KESTIX_HANDSETS"));
    const QByteArray ini = testutil::ReadFile(handsets + QStringLiteral("/demo-phone/handset.ini"));
    for (const QString &name : names) {
        ASSERT_TRUE(QDir().mkpath(handsets + QLatin1Char('/') + name + QStringLiteral("/fs")));
        testutil::WriteFile(handsets + QLatin1Char('/') + name + QStringLiteral("/handset.ini"), ini);
    }
}

// Module name -> handset of its row in a summary with a handset column.
QMap<QString, QString> HandsetRows(const QByteArray &out, QMap<QString, QString> *counts)
{
    QMap<QString, QString> rows;
    static const QRegularExpression row(QStringLiteral("^(\\w+)\\s+([\\w-]*)\\s+(\\d+)\\s+(\\d+)\\s+(\\d+)\\s+(\\d+)$"));
    for (const QString &text : QString::fromUtf8(out).split(QLatin1Char('\n'))) {
        const QRegularExpressionMatch m = row.match(text);
        if (!m.hasMatch())
            continue;
        rows.insert(m.captured(1), m.captured(2));
        counts->insert(m.captured(1), QStringList{m.captured(3), m.captured(4), m.captured(5), m.captured(6)}.join(QLatin1Char(' ')));
    }
    return rows;
}

TEST_F(DemoRun, AllTargetsShareTheModulesAndNameTheHandsetOfEach)
{
    AddDemoHandsets(env, {QStringLiteral("demo-phone2"), QStringLiteral("demo-phone3")});
    // A handset that cannot be reached leaves the work to the others.
    testutil::WriteFile(env.value(QStringLiteral("KESTIX_HANDSETS")) + QStringLiteral("/demo-phone3/offline"), "");
    const QString json = dir.filePath(QStringLiteral("summary.json"));
    const ToolResult r = Tool({QStringLiteral("run"), QStringLiteral("--all-targets"), QStringLiteral("--test-data"),
                               root + QStringLiteral("/testdata/demo.ksx"), QStringLiteral("--json"), json});
    EXPECT_EQ(r.status, 1) << r.err.constData() << r.out.constData();
    QMap<QString, QString> counts;
    const QMap<QString, QString> handsets = HandsetRows(r.out, &counts);
    // The same verdicts as a run on one handset.
    EXPECT_EQ(counts.value(QStringLiteral("ITimer")), QStringLiteral("3 1 1 0")) << r.out.constData();
    EXPECT_EQ(counts.value(QStringLiteral("IClock")), QStringLiteral("3 0 0 0"));
    EXPECT_EQ(counts.value(QStringLiteral("Widgets")), QStringLiteral("2 1 0 0"));
    EXPECT_EQ(counts.value(QStringLiteral("Sockets")), QStringLiteral("2 1 1 0"));
    EXPECT_EQ(counts.value(QStringLiteral("PlatformVersion")), QStringLiteral("2 0 0 0"));
    for (auto it = handsets.cbegin(); it != handsets.cend(); ++it) {
        EXPECT_TRUE(it.value() == QLatin1String("demo-phone") || it.value() == QLatin1String("demo-phone2"))
            << it.key().toStdString() << " " << it.value().toStdString();
    }
    EXPECT_TRUE(r.out.contains("Handset demo-phone3 could not be connected")) << r.out.constData();
    EXPECT_TRUE(testutil::ReadFile(json).contains("\"handset\"")) << testutil::ReadFile(json).constData();
}

TEST_F(DemoRun, AHandsetLostMidRunIsNamedAndItsModuleRunsElsewhere)
{
    AddDemoHandsets(env, {QStringLiteral("demo-phone2")});
    // demo-phone2 drops out at its first operation after connecting, with a
    // module in hand.
    const QString ini = env.value(QStringLiteral("KESTIX_HANDSETS")) + QStringLiteral("/demo-phone2/handset.ini");
    testutil::WriteFile(ini, testutil::ReadFile(ini) + "offlineAfter=1\n");
    const ToolResult r = Tool({QStringLiteral("run"), QStringLiteral("--all-targets"), QStringLiteral("--test-data"),
                               root + QStringLiteral("/testdata/demo.ksx")});
    EXPECT_EQ(r.status, 1) << r.err.constData() << r.out.constData();
    QMap<QString, QString> counts;
    const QMap<QString, QString> handsets = HandsetRows(r.out, &counts);
    EXPECT_EQ(counts.size(), 6) << r.out.constData();
    EXPECT_EQ(counts.value(QStringLiteral("ITimer")), QStringLiteral("3 1 1 0"));
    EXPECT_EQ(counts.value(QStringLiteral("OatAudio")), QStringLiteral("2 1 1 0"));
    EXPECT_EQ(QSet<QString>(handsets.cbegin(), handsets.cend()), QSet<QString>{QStringLiteral("demo-phone")});
    EXPECT_TRUE(r.out.contains("Handset demo-phone2 dropped out at ")) << r.out.constData();
}

TEST_F(DemoRun, WhenEveryHandsetIsGoneRetryRunsWhatNeverRan)
{
    AddDemoHandsets(env, {QStringLiteral("demo-phone2")});
    const QString handsets = env.value(QStringLiteral("KESTIX_HANDSETS"));
    for (const char *name : {"/demo-phone/offline", "/demo-phone2/offline"})
        testutil::WriteFile(handsets + QLatin1String(name), "");
    const ToolResult gone = Tool({QStringLiteral("run"), QStringLiteral("--target"), QStringLiteral("demo-phone"),
                                  QStringLiteral("--target"), QStringLiteral("demo-phone2")});
    EXPECT_EQ(gone.status, 1);
    EXPECT_TRUE(gone.out.contains("Modules that never ran (run again with --retry): ")) << gone.out.constData();

    QFile::remove(handsets + QStringLiteral("/demo-phone/offline"));
    QFile::remove(handsets + QStringLiteral("/demo-phone2/offline"));
    const ToolResult retry = Tool({QStringLiteral("run"), QStringLiteral("--retry"), QStringLiteral("--target"),
                                   QStringLiteral("demo-phone"), QStringLiteral("--target"), QStringLiteral("phone2")});
    QMap<QString, QString> counts;
    HandsetRows(retry.out, &counts);
    EXPECT_EQ(counts.value(QStringLiteral("IClock")), QStringLiteral("3 0 0 0")) << retry.out.constData();
    EXPECT_EQ(counts.size(), 6);

    const ToolResult unknown = Tool({QStringLiteral("run"), QStringLiteral("--target"), QStringLiteral("demo-phone"),
                                     QStringLiteral("--target"), QStringLiteral("no-such-phone")});
    EXPECT_EQ(unknown.status, 2);
    EXPECT_TRUE(unknown.err.contains("no handset matching 'no-such-phone'")) << unknown.err.constData();
}

} // namespace
