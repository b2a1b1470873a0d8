#pragma once

// Helpers shared by the benchmark programs: child processes (for peak memory),
// reading whole trees (the I/O baseline) and the size of workloads.

#include <QByteArray>
#include <QString>
#include <QStringList>

#include <functional>

#include <benchmark/benchmark.h>

namespace benchutil {

// A bench program started as "<program> --child <name> <arguments...>" runs
// the child function registered under name instead of the benchmarks and
// exits with its status. Register from a static initialiser:
//
//   static const bool registered = benchutil::RegisterChild("scan", ScanChild);
using ChildFunction = std::function<int(const QStringList &arguments)>;
bool RegisterChild(const QString &name, ChildFunction function);
// True when argv asks for a child mode; *status is then its exit status.
bool RunChildMode(int argc, char **argv, int *status);
// Runs this program in child mode name with the arguments and returns its
// standard output (empty when it fails, with the reason in *error).
QByteArray RunChild(const QString &name, const QStringList &arguments, QString *error);

// The peak resident set size of this program so far (VmHWM), in KiB.
long PeakRssKiB();

// Reads every file below root once (sorted walk); returns the bytes read.
qint64 ReadTree(const QString &root);

// A folder that lives as long as the process: kits and logs are generated
// once per program and shared by its benchmarks. HARNESS_BENCH_WORK names a
// folder to use instead (kept, so that a later run reuses what it holds).
QString WorkFolder();

// Sets the minimum time of a benchmark: HARNESS_BENCH_MIN_TIME when set (0
// runs it exactly once, for profiling under callgrind), otherwise seconds.
void SetMinTime(benchmark::internal::Benchmark *benchmark, double seconds);

} // namespace benchutil
