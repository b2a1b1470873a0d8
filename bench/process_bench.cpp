// The processed-results file under load: reprocessing a saved tree of 500,
// 2,000 and 8,000 module logs (Harness::Process) against parsing the same
// logs alone (each kind's ParseLog), and recording one module during a run
// as the file grows with the kit.

#include "catalogue/manifest.h"
#include "catalogue/testmodule.h"
#include "catalogue/testresults.h"
#include "controller/harness.h"
#include "controller/processedresults.h"
#include "controller/resultssession.h"

#include "support/benchkits.h"
#include "support/benchutil.h"

#include <QDir>
#include <QFile>

#include <benchmark/benchmark.h>

#include <map>
#include <memory>

// The Harness lets this class reach its private state, as it does for the
// controller tests: the catalogues are handed over ready-made, and one
// module is recorded the way the run loop records it.
class HarnessControllerAccess
{
public:
    static void SetCatalogues(Harness &harness, QSharedPointer<Manifest> kit, QSharedPointer<Manifest> platform)
    {
        harness.m_kitManifest = kit;
        harness.m_platformManifest = platform;
        harness.m_environmentReady = true;
    }
    static QMap<QString, QString> &Environment(Harness &harness) { return harness.m_environment; }
    static void Update(Harness &harness, QSharedPointer<_TestModule> module)
    {
        harness.UpdateProcessedModulesXML(module);
    }
    // The results document held open as Run holds it (written after every
    // module) or, with deferSave, as Process holds it (written at the end).
    struct Session
    {
        Session(Harness &harness, bool deferSave) : session(harness, deferSave) { }
        Harness::ResultsSession session;
    };
};

namespace {

// The kit's catalogue, read from its cache (written by one scan), and an
// empty platform catalogue.
struct Catalogues
{
    QSharedPointer<Manifest> kit;
    QSharedPointer<Manifest> platform;
    QString error;
};

const Catalogues &CataloguesFor(int modules)
{
    static std::map<int, Catalogues> made;
    auto found = made.find(modules);
    if (found != made.end())
        return found->second;
    Catalogues &catalogues = made[modules];
    const QString kit = benchkits::Kit(modules, &catalogues.error);
    if (kit.isEmpty())
        return catalogues;
    catalogues.kit.reset(new Manifest(kit, false));
    if (!catalogues.kit->GenerateManifest(false)) {
        catalogues.error = QStringLiteral("the scan of %1 found nothing").arg(kit);
        return catalogues;
    }
    const QString platform = benchutil::WorkFolder() + QStringLiteral("/empty-platform");
    QDir().mkpath(platform);
    catalogues.platform.reset(new Manifest(platform, true));
    return catalogues;
}

bool Prepare(benchmark::State &state, const Catalogues *&catalogues, QString &logs)
{
    const int modules = int(state.range(0));
    catalogues = &CataloguesFor(modules);
    QString error = catalogues->error;
    if (error.isEmpty())
        logs = benchkits::Logs(modules, &error);
    if (!error.isEmpty()) {
        state.SkipWithError(error.toStdString().c_str());
        return false;
    }
    // Every figure is taken with the logs in the page cache, the first
    // iteration's included.
    benchutil::ReadTree(logs);
    return true;
}

// Process(0) over the tree, from a results file of the previous run (the
// first iteration writes it): every log parsed and recorded, the file read
// once and written once.
void BM_Process(benchmark::State &state)
{
    const Catalogues *catalogues = nullptr;
    QString logs;
    if (!Prepare(state, catalogues, logs))
        return;
    Harness warmup;
    warmup.SetLogOutputPath(logs);
    HarnessControllerAccess::SetCatalogues(warmup, catalogues->kit, catalogues->platform);
    if (!warmup.Process(0)) {
        state.SkipWithError("Process failed");
        return;
    }
    for (auto _ : state) {
        Harness harness;
        harness.SetLogOutputPath(logs);
        HarnessControllerAccess::SetCatalogues(harness, catalogues->kit, catalogues->platform);
        if (!harness.Process(0)) {
            state.SkipWithError("Process failed");
            break;
        }
    }
    state.counters["logs"] = double(benchkits::LogFiles(logs).size());
}

// The same logs parsed alone: the module each log's name calls for, and its
// ParseLog.
void BM_ParseLogsOnly(benchmark::State &state)
{
    const Catalogues *catalogues = nullptr;
    QString logs;
    if (!Prepare(state, catalogues, logs))
        return;
    const QStringList files = benchkits::LogFiles(logs);
    qint64 verdicts = 0;
    for (auto _ : state) {
        verdicts = 0;
        for (const QString &file : files) {
            const QSharedPointer<_TestModule> module = Manifest::CreateTestModuleFromLog(file);
            if (!module)
                continue;
            module->AddDesktopLogFile(file);
            TestResults results;
            if (module->ParseLog(results))
                verdicts += results.caseResults.size();
        }
    }
    state.counters["logs"] = double(files.size());
    state.counters["verdicts"] = double(verdicts);
}

// One module recorded during a run (parse its log, record its verdicts,
// write the file) with the results file of a kit of state.range(0) modules,
// the last module of the kit recorded. NoWrite is the same without writing
// the file (what must not grow with the file); ParseOnly parses the log.
enum class Recording { ParseOnly, NoWrite, Write };

void RecordModule(benchmark::State &state, Recording mode)
{
    const bool write = mode == Recording::Write;
    const Catalogues *catalogues = nullptr;
    QString logs;
    if (!Prepare(state, catalogues, logs))
        return;
    const QStringList files = benchkits::LogFiles(logs);
    const int modules = int(state.range(0));
    // The last module of the kit that leaves a log.
    int last = modules - 1;
    while (benchkits::ModuleAt(last).kind == QLatin1String("secondary"))
        --last;
    const benchkits::ModuleInfo info = benchkits::ModuleAt(last);
    QString log;
    for (const QString &file : files) {
        if (QFileInfo(file).fileName().startsWith(info.name + QLatin1Char('.'))
            || QFileInfo(file).fileName().startsWith(info.name + QLatin1Char('-'))) {
            log = file;
            break;
        }
    }
    if (log.isEmpty()) {
        state.SkipWithError("no log of the last module");
        return;
    }
    const QString folder = benchutil::WorkFolder() + QStringLiteral("/record-%1").arg(modules);
    QDir(folder).removeRecursively();
    QDir().mkpath(folder);
    if (mode == Recording::ParseOnly) {
        for (auto _ : state) {
            QSharedPointer<_TestModule> module = Manifest::CreateTestModuleFromLog(log);
            module->AddDesktopLogFile(log);
            TestResults results;
            benchmark::DoNotOptimize(module->ParseLog(results));
        }
        return;
    }

    Harness harness;
    harness.SetLogOutputPath(folder);
    HarnessControllerAccess::SetCatalogues(harness, catalogues->kit, catalogues->platform);
    HarnessControllerAccess::Session session(harness, !write);
    const auto record = [&] {
        QSharedPointer<_TestModule> module = Manifest::CreateTestModuleFromLog(log);
        module->AddDesktopLogFile(log);
        HarnessControllerAccess::Update(harness, module);
    };
    // The first module opens the file (building its skeleton).
    record();
    for (auto _ : state)
        record();
    state.counters["file_bytes"] = double(
        QFileInfo(HarnessControllerAccess::Environment(harness).value(QStringLiteral("ProcessedResultsPath"))).size());
}

void BM_RecordModule(benchmark::State &state)
{
    RecordModule(state, Recording::Write);
}

void BM_RecordModuleNoWrite(benchmark::State &state)
{
    RecordModule(state, Recording::NoWrite);
}

void BM_ParseOneLog(benchmark::State &state)
{
    RecordModule(state, Recording::ParseOnly);
}

using benchkits::KitSizes;

BENCHMARK(BM_ParseLogsOnly)->Apply(KitSizes);
BENCHMARK(BM_Process)->Apply(KitSizes);
BENCHMARK(BM_ParseOneLog)->Apply(KitSizes);
BENCHMARK(BM_RecordModule)->Apply(KitSizes);
BENCHMARK(BM_RecordModuleNoWrite)->Apply(KitSizes);

} // namespace
