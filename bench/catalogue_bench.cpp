// The catalogue of big kits: scanning a kit (GenerateManifest(true)) against
// reading every file of it once, reading the cached catalogue (ReadManifest)
// against a bare DOM parse of the same file, and the peak memory of the
// largest scan.

#include "catalogue/manifest.h"

#include "support/benchkits.h"
#include "support/benchutil.h"

#include <QDomDocument>
#include <QFile>
#include <QTextStream>

#include <benchmark/benchmark.h>

namespace {

constexpr int kPeakModules = 8000;
constexpr double kPeakLimitMiB = 400;

// The kit of state.range(0) modules, or a skipped benchmark.
QString KitFor(benchmark::State &state)
{
    QString error;
    const QString kit = benchkits::Kit(int(state.range(0)), &error);
    if (kit.isEmpty())
        state.SkipWithError(error.toStdString().c_str());
    else
        benchutil::ReadTree(kit); // into the page cache, for the first iteration too
    return kit;
}

void BM_Scan(benchmark::State &state)
{
    const QString kit = KitFor(state);
    if (kit.isEmpty())
        return;
    qsizetype modules = 0;
    for (auto _ : state) {
        Manifest manifest(kit, false);
        if (!manifest.GenerateManifest(true)) {
            state.SkipWithError("the scan found nothing");
            break;
        }
        modules = manifest.testModules.size();
    }
    state.counters["modules"] = double(modules);
}

void BM_ReadKitFiles(benchmark::State &state)
{
    const QString kit = KitFor(state);
    if (kit.isEmpty())
        return;
    qint64 bytes = 0;
    for (auto _ : state)
        bytes = benchutil::ReadTree(kit);
    state.counters["bytes"] = double(bytes);
}

// The cache of the kit, written by one scan.
QString CacheFor(benchmark::State &state)
{
    const QString kit = KitFor(state);
    if (kit.isEmpty())
        return QString();
    Manifest manifest(kit, false);
    if (!QFile::exists(manifest.ManifestFilePath()) && !manifest.GenerateManifest(true)) {
        state.SkipWithError("the scan found nothing");
        return QString();
    }
    return manifest.ManifestFilePath();
}

void BM_ReadManifest(benchmark::State &state)
{
    if (CacheFor(state).isEmpty())
        return;
    Manifest manifest(benchkits::Kit(int(state.range(0)), nullptr), false);
    for (auto _ : state) {
        if (!manifest.ReadManifest()) {
            state.SkipWithError("cannot read the cache");
            break;
        }
    }
    state.counters["modules"] = double(manifest.testModules.size());
}

void BM_ParseManifestDom(benchmark::State &state)
{
    const QString cache = CacheFor(state);
    if (cache.isEmpty())
        return;
    for (auto _ : state) {
        QFile file(cache);
        QDomDocument document;
        if (!file.open(QIODevice::ReadOnly) || !document.setContent(&file)) {
            state.SkipWithError("cannot parse the cache");
            break;
        }
        benchmark::DoNotOptimize(document.documentElement());
    }
}

// Child: scans the kit given and prints its peak resident size (KiB) after
// the scan, or with "idle" only after starting up. A second argument names
// where to keep a copy of the cache written.
int ScanChild(const QStringList &arguments)
{
    if (arguments.value(0) != QLatin1String("idle")) {
        Manifest manifest(arguments.value(0), false);
        if (!manifest.GenerateManifest(true))
            return 1;
        if (arguments.size() > 1 && !QFile::copy(manifest.ManifestFilePath(), arguments.value(1)))
            return 1;
    }
    QTextStream(stdout) << benchutil::PeakRssKiB() << Qt::endl;
    return 0;
}
const bool kScanChild = benchutil::RegisterChild(QStringLiteral("scan"), ScanChild);

void BM_ScanPeakMemory(benchmark::State &state)
{
    const QString kit = KitFor(state);
    if (kit.isEmpty())
        return;
    double peak = 0;
    double idle = 0;
    for (auto _ : state) {
        QString error;
        const QByteArray scanned = benchutil::RunChild(QStringLiteral("scan"), {kit}, &error);
        const QByteArray started = benchutil::RunChild(QStringLiteral("scan"), {QStringLiteral("idle")}, &error);
        if (scanned.isEmpty() || started.isEmpty()) {
            state.SkipWithError(error.toStdString().c_str());
            break;
        }
        peak = scanned.trimmed().toDouble() / 1024;
        idle = started.trimmed().toDouble() / 1024;
    }
    state.counters["peak_MiB"] = peak;
    state.counters["baseline_MiB"] = idle;
    state.counters["limit_MiB"] = kPeakLimitMiB;
}

using benchkits::KitSizes;

BENCHMARK(BM_ReadKitFiles)->Apply(KitSizes);
BENCHMARK(BM_Scan)->Apply(KitSizes);
BENCHMARK(BM_ParseManifestDom)->Apply(KitSizes);
BENCHMARK(BM_ReadManifest)->Apply(KitSizes);
BENCHMARK(BM_ScanPeakMemory)->ArgName("modules")->Arg(kPeakModules)->Iterations(1)->Unit(benchmark::kSecond);

} // namespace
