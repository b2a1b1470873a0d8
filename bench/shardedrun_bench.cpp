// Wall time of one selection run on one handset and shared by four: 24
// modules whose behaviour takes 0.2 s each on the emulated handset. Four
// handsets should need about a quarter of the one-handset time.

#include "support/benchutil.h"

#include "catalogue/testmodule.h"
#include "controller/harness.h"
#include "controller/shardedrun.h"
#include "log/log.h"

#include "support/kitrun.h"

#include <QDir>

#include <memory>
#include <vector>

namespace {

constexpr int kCtfModules = 20;
constexpr int kAppletModules = 4;
constexpr int kHandsets = 4;

// The kit, the handsets and a log, made once per program.
struct Setting
{
    Setting()
    {
        testutil::AddShardModules(run.Kit(), kCtfModules, kAppletModules, QStringLiteral("0.2"));
        handsets = run.AddHandsets(kHandsets);
    }

    testutil::KitRun run;
    QStringList handsets;
};

Setting &Shared()
{
    static Setting setting;
    return setting;
}

QList<QSharedPointer<_TestModule>> Select(Harness &harness)
{
    QList<QSharedPointer<_TestModule>> modules;
    harness.GetTestModules(modules, {QStringLiteral("*")}, QString(), QString());
    return modules;
}

// Baseline: Harness::Run() of the whole selection on one handset.
void BM_HarnessRun(benchmark::State &state)
{
    Setting &setting = Shared();
    if (!setting.run.Kit().Ok()) {
        state.SkipWithError("the kit could not be built");
        return;
    }
    for (auto _ : state) {
        Harness harness;
        setting.run.Configure(harness, setting.handsets.first(), setting.run.log());
        for (const QSharedPointer<_TestModule> &module : Select(harness))
            harness.AddTest(module);
        if (!harness.Run())
            state.SkipWithError("the run failed");
        harness.DisconnectTarget();
    }
}
BENCHMARK(BM_HarnessRun)->Iterations(1)->UseRealTime()->Unit(benchmark::kMillisecond);

// The same selection through ShardedRun on the first `handsets` handsets.
void BM_ShardedRun(benchmark::State &state)
{
    Setting &setting = Shared();
    if (!setting.run.Kit().Ok()) {
        state.SkipWithError("the kit could not be built");
        return;
    }
    for (auto _ : state) {
        std::vector<std::unique_ptr<Harness>> harnesses;
        ShardedRun run(setting.run.log());
        for (int i = 0; i < state.range(0); ++i) {
            harnesses.push_back(std::make_unique<Harness>());
            setting.run.Configure(*harnesses.back(), setting.handsets.at(i), setting.run.log());
            run.AddHandset(harnesses.back().get());
        }
        if (!run.Run(Select(*harnesses.front())))
            state.SkipWithError("modules were left");
        for (const std::unique_ptr<Harness> &harness : harnesses)
            harness->DisconnectTarget();
    }
    state.counters["modules"] = kCtfModules + kAppletModules;
}
BENCHMARK(BM_ShardedRun)
    ->ArgName("handsets")
    ->Arg(1)
    ->Arg(kHandsets)
    ->Iterations(1)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);

} // namespace
