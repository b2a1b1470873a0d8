#include "support/benchutil.h"

#include "common/clock.h"

#include <QCoreApplication>
#include <QTemporaryDir>

#include <benchmark/benchmark.h>

// Every benchmark program runs with a private data root (manifest caches and
// handset folders land there, never in the user's folders) and an instant
// clock.
int main(int argc, char **argv)
{
    QCoreApplication app(argc, argv);
    QTemporaryDir root;
    if (!root.isValid())
        return 2;
    qputenv("KESTIX_DATA_ROOT", root.path().toLocal8Bit());
    qputenv("KESTIX_HANDSETS", (root.path() + QStringLiteral("/handsets")).toLocal8Bit());
    qputenv("KESTIX_TIME_SCALE", "0");
    for (const char *name : {"KESTIX_TOOLSET", "KESTIX_PLATFORMS_ALL", "KESTIX_PLATFORM",
                             "KESTIX_TESTSETS_ALL", "KESTIX_TESTSET"})
        qunsetenv(name);
    Clock::SetScale(0.0);

    int childStatus = 0;
    if (benchutil::RunChildMode(argc, argv, &childStatus))
        return childStatus;

    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv))
        return 1;
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    return 0;
}
