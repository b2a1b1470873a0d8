// How evenly a selection splits between hosts: 10,000 modules with skewed
// durations (log-normal test case counts and times per test case, seeded)
// planned into 10, 50 and 200 shards, with every module's history known,
// with 80 % known, and with none (test-case counts only). Each module really
// takes its true time; the plan only sees the median of three earlier runs
// that varied by a few percent. Counters: the longest shard's real time over
// the mean shard time ("longest_over_mean"; 1.0 is a perfect split) and the
// same for the times the plan expected.

#include "support/benchutil.h"

#include "controller/shardplan.h"

#include <algorithm>
#include <cmath>
#include <random>
#include <vector>

namespace {

constexpr int kModules = 10000;

struct Workload
{
    QList<ShardPlan::Module> selection;
    std::vector<double> trueMs; // by selection index
};

Workload Make(int percentKnown)
{
    std::mt19937_64 random(20261206);
    std::lognormal_distribution<double> testCases(std::log(8.0), 0.8);
    std::lognormal_distribution<double> msPerTestCase(std::log(2000.0), 0.7);
    std::lognormal_distribution<double> jitter(0.0, 0.05);
    std::uniform_int_distribution<int> percent(0, 99);
    Workload workload;
    for (int i = 0; i < kModules; ++i) {
        const int cases = std::clamp(int(std::lround(testCases(random))), 1, 1000);
        const double ms = cases * msPerTestCase(random);
        double runs[3] = {ms * jitter(random), ms * jitter(random), ms * jitter(random)};
        std::sort(runs, runs + 3);
        const bool known = percent(random) < percentKnown;
        workload.selection.append({QStringLiteral("Module%1").arg(i, 5, 10, QLatin1Char('0')), QStringLiteral("KVK"),
                                   cases, known ? qint64(std::llround(runs[1])) : -1});
        workload.trueMs.push_back(ms);
    }
    return workload;
}

void BM_ShardPlan(benchmark::State &state)
{
    const int shards = int(state.range(0));
    const Workload workload = Make(int(state.range(1)));
    ShardPlan plan;
    for (auto _ : state) {
        plan = ShardPlan::Make(workload.selection, shards);
        benchmark::DoNotOptimize(plan.LongestShardMs());
    }
    std::vector<double> real(size_t(shards), 0.0);
    double total = 0;
    for (qsizetype i = 0; i < plan.Modules().size(); ++i) {
        real[size_t(plan.Modules().at(i).shard)] += workload.trueMs[size_t(i)];
        total += workload.trueMs[size_t(i)];
    }
    const double mean = total / shards;
    state.counters["longest_over_mean"] = *std::max_element(real.begin(), real.end()) / mean;
    state.counters["planned_longest_over_mean"] = double(plan.LongestShardMs()) / plan.MeanShardMs();
    state.counters["largest_module_over_mean"]
        = *std::max_element(workload.trueMs.begin(), workload.trueMs.end()) / mean;
}
BENCHMARK(BM_ShardPlan)
    ->ArgNames({"shards", "known_percent"})
    ->ArgsProduct({{10, 50, 200}, {100, 80, 0}})
    ->Unit(benchmark::kMillisecond);

} // namespace
