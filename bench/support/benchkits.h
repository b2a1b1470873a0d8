#pragma once

// Synthetic test kits and saved log trees of real size, made with the kit
// builder of tests/support (descriptions, "package" folders of tar packages
// with module information files, framework packages) and generated once per
// program into benchutil::WorkFolder().

#include <QString>
#include <QStringList>

#include <benchmark/benchmark.h>

namespace benchkits {

// Module number index of every kit: kinds in turn (CTF, CTF applet, OAT, UT,
// secondary), 20 to 50 test cases, two packages each holding its ".mif".
struct ModuleInfo
{
    QString kind; // "ctf", "ctfapplet", "oat", "uitf" or "secondary"
    QString name;
    QString folder; // below the kit's root
    int testCases = 0;
};
ModuleInfo ModuleAt(int index);
// The name of test case number index of a module.
QString TestCaseName(int index);

// The root of a kit of `modules` modules (plus one package folder without a
// description, a secondary package, for every 25 modules, and the four
// frameworks). Empty on failure, with the reason in *error (when given).
QString Kit(int modules, QString *error);

// A folder of `modules` saved logs, in each kind's format and under the name
// that tells its kind: one per module of the kit's first `modules` that
// writes a log (every kind but the secondary one), and in the sub-folder
// "rerun" a second run of an earlier module in place of each secondary one.
// Every test case passes or fails. Empty on failure.
QString Logs(int modules, QString *error);

// The files of a log tree that reprocessing reads ("*.log", "*.oat", "*.txt"
// outside "oatRawLogs" and "ProcessedResults"), in name order.
QStringList LogFiles(const QString &folder);

// The kit sizes every benchmark of big kits runs at (500, 2,000 and 8,000
// modules, in milliseconds): a few iterations of a big kit say enough.
void KitSizes(benchmark::internal::Benchmark *benchmark);

} // namespace benchkits
