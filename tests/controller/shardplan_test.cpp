// Splitting a selection between hosts: the plan, the shard a process runs (options and job-engine variables), the
// recorded module times and the shards' results merged into one report.

#include "controller/moduletimings.h"
#include "controller/resultsmerge.h"
#include "controller/shardplan.h"
#include "controller/shardsetting.h"
#include "modules/ctftestmodule.h"

#include "harnesstest.h"

#include <QTimeZone>

#include <algorithm>
#include <random>

namespace {

using Module = ShardPlan::Module;

// The shard of every module, by "source/name".
QMap<QString, int> Assignment(const ShardPlan &plan)
{
    QMap<QString, int> shards;
    for (const ShardPlan::Entry &entry : plan.Modules())
        shards.insert(entry.source + u'/' + entry.name, entry.shard);
    return shards;
}

TEST(ShardPlanTest, EveryModuleLandsInExactlyOneShardForAnyCount)
{
    std::mt19937 random(21);
    for (int count = 1; count <= 64; ++count) {
        QList<Module> selection;
        const int size = int(random() % 150);
        for (int i = 0; i < size; ++i) {
            const bool known = random() % 3 != 0;
            selection.append({u"M%1"_s.arg(random() % 200), i % 2 ? u"PVS"_s : u"KVK"_s, int(random() % 20),
                              known ? qint64(random() % 100000) : -1});
        }
        const ShardPlan plan = ShardPlan::Make(selection, count);
        QSet<QString> distinct;
        for (const Module &module : selection)
            distinct.insert(module.source + u'/' + module.name);
        ASSERT_EQ(plan.Modules().size(), distinct.size()) << count;
        qsizetype inShards = 0;
        qint64 total = 0;
        for (int shard = 0; shard < count; ++shard) {
            inShards += plan.Shard(shard).size();
            total += plan.ShardMs(shard);
        }
        EXPECT_EQ(inShards, distinct.size()) << count;
        const QList<QString> assigned = Assignment(plan).keys();
        EXPECT_EQ(QSet<QString>(assigned.cbegin(), assigned.cend()), distinct) << count;
        qint64 expected = 0;
        for (const ShardPlan::Entry &entry : plan.Modules())
            expected += entry.expectedMs;
        EXPECT_EQ(total, expected) << count;
    }
}

TEST(ShardPlanTest, PlanIsTheSameWhateverTheSelectionOrder)
{
    QList<Module> selection;
    for (int i = 0; i < 60; ++i) // many equal times, so only the tie rule decides
        selection.append({u"Mod%1"_s.arg(i), u"KVK"_s, 3, i % 4 ? 1000 : -1});
    const QMap<QString, int> reference = Assignment(ShardPlan::Make(selection, 7));
    std::mt19937 random(7);
    for (int round = 0; round < 5; ++round) {
        std::shuffle(selection.begin(), selection.end(), random);
        EXPECT_EQ(Assignment(ShardPlan::Make(selection, 7)), reference);
    }
}

TEST(ShardPlanTest, LongestFirstBalancesAndUnknownModulesCountTheirTestCases)
{
    // Known: 6000 ms for 3 test cases and 1000 ms for 1: the median is 1500 ms per test case (of 2000 and 1000), so 4
    // test cases count 6000 ms.
    const QList<Module> selection{{u"a"_s, u"KVK"_s, 3, 6000},
                                  {u"b"_s, u"KVK"_s, 1, 1000},
                                  {u"c"_s, u"KVK"_s, 4, -1},
                                  {u"d"_s, u"KVK"_s, 0, -1},
                                  {u"B"_s, u"KVK"_s, 9, 9}}; // "b" again
    const ShardPlan plan = ShardPlan::Make(selection, 2);
    ASSERT_EQ(plan.Modules().size(), 4);
    EXPECT_EQ(plan.Modules().at(2).expectedMs, 6000);
    EXPECT_TRUE(plan.Modules().at(2).estimated);
    EXPECT_EQ(plan.Modules().at(3).expectedMs, 1500); // no test case counts as one
    // a and c (6000 each) go to different shards, then d and b to shard 0/1.
    EXPECT_EQ(plan.ShardMs(0), 7500);
    EXPECT_EQ(plan.ShardMs(1), 7000);
    EXPECT_EQ(plan.LongestShardMs(), 7500);

    // Nothing known: the default time per test case.
    const ShardPlan blind = ShardPlan::Make({{u"x"_s, u"KVK"_s, 2, -1}}, 3);
    EXPECT_EQ(blind.Modules().at(0).expectedMs, 2 * ShardPlan::kDefaultMsPerTestCase);

    EXPECT_EQ(plan.Format(1),
              QStringLiteral("Shard 1 of 2: 2 modules, expected 7.0 s\n"
                             "  b       KVK      1.0 s\n"
                             "  c       KVK      6.0 s  (estimated from test cases)\n"));
    EXPECT_TRUE(plan.Format().startsWith(QStringLiteral("4 modules in 2 shards; longest shard 7.5 s, mean 7.3 s\n"
                                                        "Shard 0 of 2: 2 modules, expected 7.5 s\n")));
    EXPECT_EQ(ShardPlan::FormatDuration(3723400), u"1:02:03"_s);
}

TEST(ShardSettingTest, ReadsOptionsAndEngineVariables)
{
    // The options (null: not given), the engine variables "NAME=value;...", and the error a refused row gives or the
    // shard an accepted one takes.
    const struct
    {
        const char *what, *index, *count, *variables, *error;
        int expectedIndex = 0, expectedCount = 0;
    } rows[]
        = {{"nothing", nullptr, nullptr, "", nullptr, -1, 1},
           {"options", "2", "5", "", nullptr, 2, 5},
           {"bazel", nullptr, nullptr, "TEST_SHARD_INDEX=0;TEST_TOTAL_SHARDS=4", nullptr, 0, 4},
           {"gitlab is 1-based", nullptr, nullptr, "CI_NODE_INDEX=3;CI_NODE_TOTAL=3", nullptr, 2, 3},
           {"gitlab job without parallel", nullptr, nullptr, "CI_NODE_TOTAL=1", nullptr, -1, 1},
           {"kubernetes", nullptr, "6", "JOB_COMPLETION_INDEX=5", nullptr, 5, 6},
           {"options win", "1", "2", "TEST_SHARD_INDEX=7;TEST_TOTAL_SHARDS=9;CI_NODE_INDEX=x", nullptr, 1, 2},
           {"engines agree", nullptr, nullptr, "TEST_SHARD_INDEX=1;TEST_TOTAL_SHARDS=2;CI_NODE_INDEX=2;CI_NODE_TOTAL=2",
            nullptr, 1, 2},
           {"engines disagree", nullptr, nullptr,
            "TEST_SHARD_INDEX=0;TEST_TOTAL_SHARDS=2;CI_NODE_INDEX=2;CI_NODE_TOTAL=2", "disagree"},
           {"kubernetes against bazel", nullptr, "3", "JOB_COMPLETION_INDEX=1;TEST_SHARD_INDEX=1;TEST_TOTAL_SHARDS=4",
            "disagree"},
           {"kubernetes without a count", nullptr, nullptr, "JOB_COMPLETION_INDEX=1", "--shard-count"},
           {"index not below count", "3", "3", "", "not below"},
           {"bazel index not below total", nullptr, nullptr, "TEST_SHARD_INDEX=4;TEST_TOTAL_SHARDS=4", "not below"},
           {"gitlab index 0", nullptr, nullptr, "CI_NODE_INDEX=0;CI_NODE_TOTAL=2", "outside 1..2"},
           {"no shards", "0", "0", "", "must be 1 to"},
           {"too many shards", "0", "999999999", "", "must be 1 to"},
           {"negative", "-1", "3", "", "not a shard number"},
           {"not a number", "1", "three", "", "not a number of shards"},
           {"blank in a variable", nullptr, nullptr, "TEST_SHARD_INDEX= 1;TEST_TOTAL_SHARDS=2", "not a shard number"},
           {"bazel half set", nullptr, nullptr, "TEST_TOTAL_SHARDS=2", "TEST_TOTAL_SHARDS is set without"},
           {"gitlab total without index", nullptr, nullptr, "CI_NODE_TOTAL=4", "without CI_NODE_INDEX"},
           {"index without count", "1", nullptr, "", "needs --shard-count"},
           {"count without index", nullptr, "4", "", "needs --shard-index"}};
    for (const auto &row : rows) {
        SCOPED_TRACE(row.what);
        QMap<QString, QString> variables;
        for (const QString &pair : QString::fromLatin1(row.variables).split(u';', Qt::SkipEmptyParts))
            variables.insert(pair.section(u'=', 0, 0), pair.section(u'=', 1));
        const QString index = QString::fromLatin1(row.index), count = QString::fromLatin1(row.count);
        ShardSetting setting;
        QString error;
        ASSERT_EQ(ShardSetting::Resolve(index, count, variables, true, &setting, &error), !row.error)
            << error.toStdString();
        if (row.error) {
            EXPECT_TRUE(error.contains(QLatin1String(row.error))) << error.toStdString();
            continue;
        }
        EXPECT_EQ(setting.index, row.expectedIndex);
        EXPECT_EQ(setting.count, row.expectedCount);
        EXPECT_EQ(setting.sharded,
                  row.expectedCount > 1 || row.index || row.count || variables.contains(u"TEST_SHARD_INDEX"_s));
    }
}

TEST(ShardSettingTest, CountAloneServesThePlanOfEveryShardAndBazelLearnsOfSharding)
{
    QTemporaryDir dir;
    ShardSetting setting;
    QString error;
    ASSERT_TRUE(ShardSetting::Resolve(QString(), u"4"_s, {{u"TEST_SHARD_STATUS_FILE"_s, dir.filePath(u"out/status"_s)}},
                                      false, &setting, &error))
        << error.toStdString();
    EXPECT_EQ(setting.index, -1);
    EXPECT_EQ(setting.count, 4);
    ASSERT_TRUE(setting.TouchStatusFile(&error)) << error.toStdString();
    EXPECT_TRUE(QFileInfo::exists(dir.filePath(u"out/status"_s)));

    setting.statusFile = dir.filePath(u"out/status"_s) + u"/below-a-file"_s;
    EXPECT_FALSE(setting.TouchStatusFile(&error));
    EXPECT_TRUE(error.contains(u"TEST_SHARD_STATUS_FILE"_s));
}

ModuleTimings::Run At(qint64 ms, const QString &host, int minute)
{
    return {ms, u"h1"_s, host, QDateTime(QDate(2026, 12, 6), QTime(20, minute), QTimeZone::utc())};
}

TEST(ModuleTimingsTest, RecordsMergesAndKeepsTheRecentRunsAndRefusesBadOrForeignFiles)
{
    QTemporaryDir dir;
    const QString a = dir.filePath(u"a.json"_s), b = dir.filePath(u"b.json"_s);
    QString error;
    for (int i = 0; i < 12; ++i) // 100, 200, ... 1200 ms on host a
        ASSERT_TRUE(ModuleTimings::Record(a, u"Audio"_s, u"KVK"_s, At(100 * (i + 1), u"a"_s, i), &error))
            << error.toStdString();
    ASSERT_TRUE(ModuleTimings::Record(b, u"AUDIO"_s, u"KVK"_s, At(50, u"b"_s, 30), &error));
    ASSERT_TRUE(ModuleTimings::Record(b, u"Audio"_s, u"PVS"_s, At(7, u"b"_s, 31), &error));

    ModuleTimings timings;
    ASSERT_TRUE(timings.Read(a)) << timings.ErrorString().toStdString();
    // The ten most recent: 300 .. 1200; median (700 + 800) / 2.
    EXPECT_EQ(timings.Runs(u"audio"_s, u"KVK"_s).size(), ModuleTimings::kRecentRuns);
    EXPECT_EQ(timings.ExpectedMs(u"Audio"_s, u"KVK"_s), 750);
    EXPECT_EQ(timings.ExpectedMs(u"Audio"_s, u"PVS"_s), -1);

    ASSERT_TRUE(timings.Merge(b)) << timings.ErrorString().toStdString();
    ASSERT_TRUE(timings.Merge(a)); // the same runs again change nothing
    const QList<ModuleTimings::Run> runs = timings.Runs(u"Audio"_s, u"KVK"_s);
    ASSERT_EQ(runs.size(), ModuleTimings::kRecentRuns);
    EXPECT_EQ(runs.last().host, u"b"_s); // the latest, from the other host
    EXPECT_EQ(runs.first().ms, 400);
    EXPECT_EQ(timings.ExpectedMs(u"Audio"_s, u"PVS"_s), 7);
    EXPECT_EQ(timings.ModuleCount(), 2);

    const QString merged = dir.filePath(u"merged.json"_s);
    ASSERT_TRUE(timings.Save(merged));
    ModuleTimings again;
    ASSERT_TRUE(again.Read(merged));
    EXPECT_EQ(again.Runs(u"Audio"_s, u"KVK"_s), runs);
    EXPECT_EQ(ModuleTimings::PathFor(u"h1"_s).section(u'/', -3), u"Logs/ProcessedResults/Timings.json"_s);

    // Bad or foreign files are refused and lose nothing.
    const QString path = dir.filePath(u"Timings.json"_s);
    const QByteArray head = "{\"format\": \"harness-timings\", \"version\": 1, \"modules\": ";
    const QByteArray module = head + "[{\"name\": \"A\", \"source\": \"KVK\"";
    const QByteArray run = module + ", \"runs\": [{\"handset\": \"h\", \"host\": \"x\", ";
    const QList<QPair<QByteArray, const char *>> rows{
        {"{\"modules\": [", "not JSON"},
        {"[1, 2]", "not a timings file"},
        {"{\"format\": \"other\", \"version\": 1, \"modules\": []}", "not a timings file"},
        {"{\"format\": \"harness-timings\", \"version\": 2, \"modules\": []}", "version 2"},
        {head + "{}}", "\"modules\" is not a list"},
        {module + "}]}", "module 0 needs"},
        {run + "\"ms\": -5, \"at\": \"2026-12-06T20:00:00Z\"}]}]}", "whole milliseconds"},
        {run + "\"ms\": 5, \"at\": \"yesterday\"}]}]}", "ISO date"}};
    for (const auto &[bytes, message] : rows) {
        WriteFile(path, bytes);
        EXPECT_FALSE(again.Merge(path)) << message;
        EXPECT_TRUE(again.ErrorString().contains(QLatin1String(message))) << again.ErrorString().toStdString();
        EXPECT_EQ(again.Runs(u"Audio"_s, u"KVK"_s), runs) << message;
        EXPECT_FALSE(ModuleTimings::Record(path, u"B"_s, u"KVK"_s, At(1, u"a"_s, 1), &error)) << message;
        EXPECT_EQ(ReadFile(path), bytes) << message;
    }
    ModuleTimings none;
    EXPECT_FALSE(none.Read(dir.filePath(u"missing.json"_s)));
    EXPECT_TRUE(none.ErrorString().contains(u"cannot open"_s));
}

// A processed-results file of one module "M" (source KVK) whose test cases carry the given verdicts, and a module
// "Idle" that did not run.
QByteArray ResultsFile(const QStringList &verdicts, const QByteArray &kitHash = "#1")
{
    QByteArray text = "<testmodules kvkHash=\"" + kitHash
        + "\" platformHash=\"\">\n"
          " <module family=\"f\" id_hash=\"#9\" name=\"M\" source=\"KVK\" subfamily=\"s\">\n";
    for (qsizetype i = 0; i < verdicts.size(); ++i)
        text += "  <testcase name=\"t" + QByteArray::number(i) + "\" result=\"" + verdicts.at(i).toLatin1() + "\"/>\n";
    return text
        + " </module>\n <module name=\"Idle\" source=\"KVK\" id_hash=\"#8\">\n"
          "  <testcase name=\"t0\" result=\"unexecuted\"/>\n </module>\n</testmodules>\n";
}

TEST(ResultsMergeTest, AModuleRunTwiceKeepsTheVerdictThatWins)
{
    QTemporaryDir dir;
    const QString first = dir.filePath(u"data/Norvane/Targets/My%20Phone/Logs/ProcessedResults/ProcessedResults.xml"_s);
    const QString second = dir.filePath(u"b.xml"_s);
    // The verdict kept of each pair is the stronger one.
    WriteFile(first, ResultsFile({u"pass"_s, u"fail"_s, u"unexecuted"_s}));
    WriteFile(second, ResultsFile({u"fail"_s, u"pass"_s, u"unexecuted"_s}));
    ASSERT_TRUE(ModuleTimings::Record(QFileInfo(second).absolutePath() + u"/Timings.json"_s, u"m"_s, u"KVK"_s,
                                      {5, u"h2"_s, u"lab-2"_s, QDateTime::currentDateTimeUtc()}));

    ResultsMerge merge;
    ASSERT_TRUE(merge.Add(first, QString(), u"lab-1"_s)) << merge.ErrorString().toStdString();
    ASSERT_TRUE(merge.Add(second)) << merge.ErrorString().toStdString();
    // The selection as the tool gives it: a module no shard ran keeps its test cases.
    QList<QSharedPointer<_TestModule>> selection{QSharedPointer<_TestModule>(new CtfTestModule),
                                                 QSharedPointer<_TestModule>(new CtfTestModule), nullptr};
    selection[0]->moduleName = u"Other"_s;
    selection[0]->SetSource(u"PVS"_s);
    selection[0]->family = u"g"_s;
    selection[0]->testCases = {TestCase(u"x"_s, u"t"_s)};
    selection[1]->moduleName = u"M"_s;
    selection[1]->SetSource(u"KVK"_s);
    selection.append(selection.at(1)); // selected twice, reported once
    merge.Expect(ResultsMerge::ExpectedOf(selection));
    const QList<ResultsMerge::Row> rows = merge.Rows();
    ASSERT_EQ(rows.size(), 2); // "Idle" ran nowhere and was not expected
    EXPECT_EQ((QStringList{rows.at(0).name, rows.at(0).source, rows.at(0).family}),
              (QStringList{u"Other"_s, u"PVS"_s, u"g"_s}));
    EXPECT_FALSE(rows.at(0).ran);
    EXPECT_EQ(rows.at(0).testCases, (QList<QPair<QString, QString>>{{u"x"_s, u"unexecuted"_s}}));
    const ResultsMerge::Row &m = rows.at(1);
    EXPECT_TRUE(m.ran);
    EXPECT_EQ(m.family, u"f"_s);
    EXPECT_EQ(m.handset, u"My Phone, h2"_s);
    EXPECT_EQ(m.host, u"lab-1, lab-2"_s);
    EXPECT_EQ(m.testCases,
              (QList<QPair<QString, QString>>{{u"t0"_s, u"pass"_s}, {u"t1"_s, u"pass"_s}, {u"t2"_s, u"unexecuted"_s}}));
    EXPECT_EQ(merge.NotRun(), QStringList{u"Other"_s});
    EXPECT_EQ(merge.Timings().ExpectedMs(u"M"_s, u"KVK"_s), 5);
}

TEST(ResultsMergeTest, RefusesFilesItCannotMergeAndKeepsWhatItHas)
{
    QTemporaryDir dir;
    const QString good = dir.filePath(u"good.xml"_s);
    WriteFile(good, ResultsFile({u"pass"_s}));
    const QList<QPair<QByteArray, const char *>> rows{{"<testmodules><module name=", "is not a processed-results file"},
                                                      {"<manifest/>", "its root is <manifest>"},
                                                      {ResultsFile({u"fail"_s}, "#2"), "another test kit"}};
    for (const auto &[bytes, message] : rows) {
        const QString bad = dir.filePath(u"bad.xml"_s);
        WriteFile(bad, bytes);
        ResultsMerge merge;
        ASSERT_TRUE(merge.Add(good));
        EXPECT_FALSE(merge.Add(bad)) << message;
        EXPECT_TRUE(merge.ErrorString().contains(QLatin1String(message))) << merge.ErrorString().toStdString();
        ASSERT_EQ(merge.Rows().size(), 1);
        EXPECT_EQ(merge.Rows().at(0).testCases.at(0).second, u"pass"_s) << message;
    }
    ResultsMerge merge;
    EXPECT_FALSE(merge.Add(dir.filePath(u"missing.xml"_s)));
    WriteFile(dir.filePath(u"Timings.json"_s), "{}");
    EXPECT_FALSE(merge.Add(good)); // a damaged timings file beside it
    EXPECT_TRUE(merge.ErrorString().contains(u"not a timings file"_s));
}

} // namespace
