#include "support/benchutil.h"

#include "support/testutil.h"

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
    testutil::IsolateEnvironment(root);

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
