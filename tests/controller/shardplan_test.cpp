// Splitting a selection between hosts: the plan, the shard a process runs
// (options and job-engine variables) and the recorded module times.

#include "controller/moduletimings.h"
#include "controller/shardplan.h"
#include "controller/shardsetting.h"

#include "support/testutil.h"

#include <QDir>
#include <QTemporaryDir>
#include <QTimeZone>

#include <gtest/gtest.h>

#include <algorithm>
#include <random>

using namespace Qt::StringLiterals;

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
        for (const ShardPlan::Entry &entry : plan.Modules()) {
            EXPECT_GE(entry.shard, 0);
            EXPECT_LT(entry.shard, count);
            expected += entry.expectedMs;
        }
        EXPECT_EQ(total, expected) << count;
        EXPECT_TRUE(plan.Shard(count).isEmpty());
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
    // Known: 6000 ms for 3 test cases and 1000 ms for 1: the median is 1500
    // ms per test case (of 2000 and 1000), so 4 test cases count 6000 ms.
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

struct SettingRow
{
    const char *what;
    QString index;
    QString count;
    QMap<QString, QString> environment;
    bool ok;
    int expectedIndex;
    int expectedCount;
    const char *errorPart; // for a refused row
};

class ShardSettingTest : public ::testing::TestWithParam<SettingRow>
{
};

TEST_P(ShardSettingTest, ReadsOptionsAndEngineVariables)
{
    const SettingRow &row = GetParam();
    ShardSetting setting;
    QString error;
    EXPECT_EQ(ShardSetting::Resolve(row.index, row.count, row.environment, true, &setting, &error), row.ok)
        << row.what << ": " << error.toStdString();
    if (row.ok) {
        EXPECT_EQ(setting.index, row.expectedIndex) << row.what;
        EXPECT_EQ(setting.count, row.expectedCount) << row.what;
        EXPECT_EQ(setting.sharded,
                  row.expectedCount > 1 || !row.index.isEmpty() || !row.count.isEmpty()
                      || row.environment.contains(u"TEST_SHARD_INDEX"_s))
            << row.what;
    } else {
        EXPECT_TRUE(error.contains(QLatin1String(row.errorPart))) << row.what << ": " << error.toStdString();
    }
}

using Env = QMap<QString, QString>;
const QString kNone;

INSTANTIATE_TEST_SUITE_P(
    Conventions, ShardSettingTest,
    ::testing::Values(
        SettingRow{"nothing", kNone, kNone, {}, true, -1, 1, ""}, SettingRow{"options", "2", "5", {}, true, 2, 5, ""},
        SettingRow{"bazel", kNone, kNone, Env{{"TEST_SHARD_INDEX", "0"}, {"TEST_TOTAL_SHARDS", "4"}}, true, 0, 4, ""},
        SettingRow{"gitlab is 1-based", kNone, kNone, Env{{"CI_NODE_INDEX", "3"}, {"CI_NODE_TOTAL", "3"}}, true, 2, 3,
                   ""},
        SettingRow{"gitlab job without parallel", kNone, kNone, Env{{"CI_NODE_TOTAL", "1"}}, true, -1, 1, ""},
        SettingRow{"kubernetes", kNone, "6", Env{{"JOB_COMPLETION_INDEX", "5"}}, true, 5, 6, ""},
        SettingRow{"options win", "1", "2",
                   Env{{"TEST_SHARD_INDEX", "7"}, {"TEST_TOTAL_SHARDS", "9"}, {"CI_NODE_INDEX", "x"}}, true, 1, 2, ""},
        SettingRow{
            "engines that agree", kNone, kNone,
            Env{{"TEST_SHARD_INDEX", "1"}, {"TEST_TOTAL_SHARDS", "2"}, {"CI_NODE_INDEX", "2"}, {"CI_NODE_TOTAL", "2"}},
            true, 1, 2, ""},
        SettingRow{
            "engines that disagree", kNone, kNone,
            Env{{"TEST_SHARD_INDEX", "0"}, {"TEST_TOTAL_SHARDS", "2"}, {"CI_NODE_INDEX", "2"}, {"CI_NODE_TOTAL", "2"}},
            false, 0, 0, "disagree"},
        SettingRow{"kubernetes against bazel", kNone, "3",
                   Env{{"JOB_COMPLETION_INDEX", "1"}, {"TEST_SHARD_INDEX", "1"}, {"TEST_TOTAL_SHARDS", "4"}}, false, 0,
                   0, "disagree"},
        SettingRow{"kubernetes without a count", kNone, kNone, Env{{"JOB_COMPLETION_INDEX", "1"}}, false, 0, 0,
                   "--shard-count"},
        SettingRow{"index not below count", "3", "3", {}, false, 0, 0, "not below"},
        SettingRow{"bazel index not below total", kNone, kNone,
                   Env{{"TEST_SHARD_INDEX", "4"}, {"TEST_TOTAL_SHARDS", "4"}}, false, 0, 0, "not below"},
        SettingRow{"gitlab index 0", kNone, kNone, Env{{"CI_NODE_INDEX", "0"}, {"CI_NODE_TOTAL", "2"}}, false, 0, 0,
                   "outside 1..2"},
        SettingRow{"no shards", "0", "0", {}, false, 0, 0, "must be 1 to"},
        SettingRow{"too many shards", "0", "999999999", {}, false, 0, 0, "must be 1 to"},
        SettingRow{"negative", "-1", "3", {}, false, 0, 0, "not a shard number"},
        SettingRow{"not a number", "1", "three", {}, false, 0, 0, "not a number of shards"},
        SettingRow{"blank in a variable", kNone, kNone, Env{{"TEST_SHARD_INDEX", " 1"}, {"TEST_TOTAL_SHARDS", "2"}},
                   false, 0, 0, "not a shard number"},
        SettingRow{"bazel half set", kNone, kNone, Env{{"TEST_TOTAL_SHARDS", "2"}}, false, 0, 0,
                   "TEST_TOTAL_SHARDS is set without"},
        SettingRow{"gitlab total without index", kNone, kNone, Env{{"CI_NODE_TOTAL", "4"}}, false, 0, 0,
                   "without CI_NODE_INDEX"},
        SettingRow{"index without count", "1", kNone, {}, false, 0, 0, "needs --shard-count"},
        SettingRow{"count without index", kNone, "4", {}, false, 0, 0, "needs --shard-index"}),
    [](const ::testing::TestParamInfo<SettingRow> &info) {
        std::string name = info.param.what;
        std::replace_if(
            name.begin(), name.end(), [](char c) { return !std::isalnum(static_cast<unsigned char>(c)); }, '_');
        return name;
    });

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

TEST(ModuleTimingsTest, RecordsMergesAndKeepsTheRecentRuns)
{
    QTemporaryDir dir;
    const QString a = dir.filePath(u"a/Timings.json"_s);
    const QString b = dir.filePath(u"b/Timings.json"_s);
    QDir().mkpath(dir.filePath(u"a"_s));
    QDir().mkpath(dir.filePath(u"b"_s));
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
}

TEST(ModuleTimingsTest, RefusesBadOrForeignFilesAndLosesNothing)
{
    QTemporaryDir dir;
    const QString path = dir.filePath(u"Timings.json"_s);
    const QString good = dir.filePath(u"good.json"_s);
    ASSERT_TRUE(ModuleTimings::Record(good, u"Audio"_s, u"KVK"_s, At(10, u"a"_s, 0)));
    const QList<QPair<QByteArray, const char *>> rows{
        {"{\"modules\": [", "not JSON"},
        {"[1, 2]", "not a timings file"},
        {"{\"format\": \"other\", \"version\": 1, \"modules\": []}", "not a timings file"},
        {"{\"format\": \"harness-timings\", \"version\": 2, \"modules\": []}", "version 2"},
        {"{\"format\": \"harness-timings\", \"version\": 1, \"modules\": {}}", "\"modules\" is not a list"},
        {"{\"format\": \"harness-timings\", \"version\": 1, \"modules\": [{\"name\": \"A\", \"source\": \"KVK\"}]}",
         "module 0 needs"},
        {"{\"format\": \"harness-timings\", \"version\": 1, \"modules\": [{\"name\": \"A\", \"source\": \"KVK\", "
         "\"runs\": [{\"ms\": -5, \"handset\": \"h\", \"host\": \"x\", \"at\": \"2026-12-06T20:00:00Z\"}]}]}",
         "whole milliseconds"},
        {"{\"format\": \"harness-timings\", \"version\": 1, \"modules\": [{\"name\": \"A\", \"source\": \"KVK\", "
         "\"runs\": [{\"ms\": 5, \"handset\": \"h\", \"host\": \"x\", \"at\": \"yesterday\"}]}]}",
         "ISO date"},
    };
    for (const auto &[bytes, message] : rows) {
        testutil::WriteFile(path, bytes);
        ModuleTimings timings;
        ASSERT_TRUE(timings.Read(good));
        EXPECT_FALSE(timings.Merge(path)) << message;
        EXPECT_TRUE(timings.ErrorString().contains(QLatin1String(message))) << timings.ErrorString().toStdString();
        EXPECT_EQ(timings.ExpectedMs(u"Audio"_s, u"KVK"_s), 10) << message;
        QString error;
        EXPECT_FALSE(ModuleTimings::Record(path, u"B"_s, u"KVK"_s, At(1, u"a"_s, 1), &error)) << message;
        EXPECT_EQ(testutil::ReadFile(path), bytes) << message;
    }
    ModuleTimings timings;
    EXPECT_FALSE(timings.Read(dir.filePath(u"missing.json"_s)));
    EXPECT_TRUE(timings.ErrorString().contains(u"cannot open"_s));
}

} // namespace
