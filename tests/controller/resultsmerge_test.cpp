// The results of several hosts' shards merged into one report.

#include "controllertest.h"

#include "controller/moduletimings.h"
#include "controller/resultsmerge.h"
#include "controller/shardplan.h"
#include "environment/testdirectories.h"
#include "support/handsetfixture.h"
#include "support/shardkit.h"

#include <QTimeZone>

#include <memory>

namespace {

using testutil::WriteFile;

// A processed-results file of one module "M" (source KVK) whose test cases
// carry the given verdicts, and a module "Idle" that did not run.
QByteArray ResultsFile(const QStringList &verdicts, const QByteArray &kitHash = "#1")
{
    QByteArray text = "<testmodules kvkHash=\"" + kitHash + "\" platformHash=\"\">\n"
                      " <module family=\"f\" id_hash=\"#9\" name=\"M\" source=\"KVK\" subfamily=\"s\">\n";
    for (qsizetype i = 0; i < verdicts.size(); ++i)
        text += "  <testcase name=\"t" + QByteArray::number(i) + "\" result=\"" + verdicts.at(i).toLatin1() + "\"/>\n";
    return text + " </module>\n <module name=\"Idle\" source=\"KVK\" id_hash=\"#8\">\n"
                  "  <testcase name=\"t0\" result=\"unexecuted\"/>\n </module>\n</testmodules>\n";
}

TEST(ResultsMergeTest, AModuleRunTwiceKeepsTheVerdictThatWins)
{
    QTemporaryDir dir;
    const QString first = dir.filePath(QStringLiteral("data/Norvane/Targets/My%20Phone/Logs/ProcessedResults/ProcessedResults.xml"));
    const QString second = dir.filePath(QStringLiteral("b.xml"));
    // stored (first file) -> reported (second file) -> kept
    const QStringList stored{"pass", "fail", "fail", "unsupported", "fail", "unexecuted", "unexecuted"};
    const QStringList reported{"fail", "pass", "unsupported", "fail", "unexecuted", "unexecuted", "pass"};
    const QStringList kept{"pass", "pass", "unsupported", "fail", "fail", "unexecuted", "pass"};
    WriteFile(first, ResultsFile(stored));
    WriteFile(second, ResultsFile(reported));
    ASSERT_TRUE(ModuleTimings::Record(QFileInfo(second).absolutePath() + QStringLiteral("/Timings.json"),
                                      QStringLiteral("m"), QStringLiteral("KVK"),
                                      {5, QStringLiteral("h2"), QStringLiteral("lab-2"), QDateTime::currentDateTimeUtc()}));

    ResultsMerge merge;
    ASSERT_TRUE(merge.Add(first, QString(), QStringLiteral("lab-1"))) << merge.ErrorString().toStdString();
    ASSERT_TRUE(merge.Add(second)) << merge.ErrorString().toStdString();
    merge.Expect({{QStringLiteral("Other"), QStringLiteral("PVS"), QStringLiteral("g"), QString(), {QStringLiteral("x")}},
                  {QStringLiteral("M"), QStringLiteral("KVK"), QString(), QString(), {}}});
    const QList<ResultsMerge::Row> rows = merge.Rows();
    ASSERT_EQ(rows.size(), 2);  // "Idle" ran nowhere and was not expected
    EXPECT_EQ(rows.at(0).name, QStringLiteral("Other"));
    EXPECT_FALSE(rows.at(0).ran);
    EXPECT_EQ(rows.at(0).testCases, (QList<QPair<QString, QString>>{{QStringLiteral("x"), QStringLiteral("unexecuted")}}));
    const ResultsMerge::Row &m = rows.at(1);
    EXPECT_TRUE(m.ran);
    EXPECT_EQ(m.family, QStringLiteral("f"));
    EXPECT_EQ(m.handset, QStringLiteral("My Phone, h2"));
    EXPECT_EQ(m.host, QStringLiteral("lab-1, lab-2"));
    ASSERT_EQ(m.testCases.size(), kept.size());
    for (qsizetype i = 0; i < kept.size(); ++i)
        EXPECT_EQ(m.testCases.at(i).second, kept.at(i)) << stored.at(i).toStdString() << " then " << reported.at(i).toStdString();
    EXPECT_EQ(merge.NotRun(), QStringList{QStringLiteral("Other")});
    EXPECT_EQ(merge.Timings().ExpectedMs(QStringLiteral("M"), QStringLiteral("KVK")), 5);
}

TEST(ResultsMergeTest, RefusesFilesItCannotMergeAndKeepsWhatItHas)
{
    QTemporaryDir dir;
    const QString good = dir.filePath(QStringLiteral("good.xml"));
    WriteFile(good, ResultsFile({QStringLiteral("pass")}));
    const QList<QPair<QByteArray, const char *>> rows{
        {"<testmodules><module name=", "is not a processed-results file"},
        {"<manifest/>", "its root is <manifest>"},
        {ResultsFile({QStringLiteral("fail")}, "#2"), "another test kit"},
    };
    for (const auto &[bytes, message] : rows) {
        const QString bad = dir.filePath(QStringLiteral("bad.xml"));
        WriteFile(bad, bytes);
        ResultsMerge merge;
        ASSERT_TRUE(merge.Add(good));
        EXPECT_FALSE(merge.Add(bad)) << message;
        EXPECT_TRUE(merge.ErrorString().contains(QLatin1String(message))) << merge.ErrorString().toStdString();
        ASSERT_EQ(merge.Rows().size(), 1);
        EXPECT_EQ(merge.Rows().at(0).testCases.at(0).second, QStringLiteral("pass")) << message;
    }
    ResultsMerge merge;
    EXPECT_FALSE(merge.Add(dir.filePath(QStringLiteral("missing.xml"))));
    WriteFile(dir.filePath(QStringLiteral("Timings.json")), "{}");
    EXPECT_FALSE(merge.Add(good));  // a damaged timings file beside it
    EXPECT_TRUE(merge.ErrorString().contains(QLatin1String("not a timings file")));
}

// Shards 0 and 1 of 3 on two handsets against the whole selection on a third:
// the merge gives the same verdicts, and shard 2's modules as not run.
TEST(ResultsMergeTest, MergedShardsEqualOneRunOfTheSelection)
{
    QTemporaryDir dir;
    testutil::EnvGuard env("KESTIX_DATA_ROOT", dir.filePath(QStringLiteral("data")));
    testutil::HandsetFixture handsets;
    const shardkit::ShardKit kit(dir.path(), 8, 2, QStringLiteral("0"));
    ASSERT_TRUE(kit.Ok()) << kit.Errors().join(QLatin1Char('\n')).toStdString();
    const QStringList names = shardkit::ShardKit::AddHandsets(handsets, 3);
    harnesstest::CapturedLog log;

    Harness selector;
    kit.Configure(selector, QString(), dir.filePath(QStringLiteral("logs")), nullptr);
    QList<QSharedPointer<_TestModule>> selection;
    selector.GetTestModules(selection, {QStringLiteral("*")}, QString(), QString());
    QList<ShardPlan::Module> planned;
    for (const QSharedPointer<_TestModule> &module : std::as_const(selection))
        planned.append({module->moduleName, module->Source(), int(module->testCases.size()), -1});
    const QList<ResultsMerge::Expected> expected = ResultsMerge::ExpectedOf(selection);
    const ShardPlan plan = ShardPlan::Make(planned, 3);

    // Handset i runs shard i (0, 1); the last handset runs everything.
    for (int i = 0; i < 3; ++i) {
        Harness harness;
        kit.Configure(harness, names.at(i), dir.filePath(QStringLiteral("logs")), log.log());
        for (const QSharedPointer<_TestModule> &module : std::as_const(selection)) {
            const auto entry = std::find_if(plan.Modules().cbegin(), plan.Modules().cend(), [&](const ShardPlan::Entry &e) {
                return e.name == module->moduleName && e.source == module->Source();
            });
            if (i == 2 || entry->shard == i)
                harness.AddTest(harness.FindTestModule(module->moduleName, module->Source()));
        }
        ASSERT_TRUE(harness.Run()) << log.Text().toStdString();
        harness.DisconnectTarget();
    }

    ResultsMerge shards;
    ASSERT_TRUE(shards.Add(TestDirectories::GetProcessResultsPath(names.at(0))));
    ASSERT_TRUE(shards.Add(TestDirectories::GetProcessResultsPath(names.at(1))));
    shards.Expect(expected);
    ResultsMerge whole;
    ASSERT_TRUE(whole.Add(TestDirectories::GetProcessResultsPath(names.at(2))));
    whole.Expect(expected);

    const QList<ResultsMerge::Row> merged = shards.Rows();
    const QList<ResultsMerge::Row> reference = whole.Rows();
    ASSERT_EQ(merged.size(), selection.size());
    ASSERT_EQ(reference.size(), selection.size());
    QStringList notRun;
    for (qsizetype i = 0; i < merged.size(); ++i) {
        const ShardPlan::Entry &entry = plan.Modules().at(i);
        ASSERT_EQ(merged.at(i).name, entry.name);
        EXPECT_TRUE(reference.at(i).ran);
        if (entry.shard == 2) {
            notRun.append(entry.name);
            EXPECT_FALSE(merged.at(i).ran) << entry.name.toStdString();
            continue;
        }
        EXPECT_EQ(merged.at(i).handset, names.at(entry.shard));
        EXPECT_EQ(merged.at(i).testCases, reference.at(i).testCases) << entry.name.toStdString();
        EXPECT_EQ(merged.at(i).family, reference.at(i).family);
    }
    EXPECT_FALSE(notRun.isEmpty());
    EXPECT_EQ(shards.NotRun(), notRun);
}

} // namespace
