// Saving and loading resource files and reading tar archives: each should
// grow linearly with the number of resources or members.
#include "archive/tar.h"
#include "resources/resourcestream.h"

#include <QTemporaryDir>

#include <benchmark/benchmark.h>

namespace {

// `count` resources, one distinct block in `distinct`, spread over types.
ResourceStream MakeTable(int count, int distinct)
{
    ResourceStream stream;
    for (int i = 0; i < count; ++i)
        stream.AddResource(quint16(1 + i / 20000), quint16(i % 20000), QByteArray::number(i % distinct).repeated(4));
    return stream;
}

void BM_SaveResources(benchmark::State &state)
{
    const int count = int(state.range(0));
    ResourceStream stream = MakeTable(count, count);
    for (auto _ : state) {
        QByteArray bytes;
        benchmark::DoNotOptimize(stream.SaveTo(bytes));
    }
    state.SetComplexityN(count);
}
BENCHMARK(BM_SaveResources)->RangeMultiplier(4)->Range(1024, 65535)->Complexity(benchmark::oN);

void BM_SaveSharedResources(benchmark::State &state)
{
    const int count = int(state.range(0));
    ResourceStream stream = MakeTable(count, 7);
    for (auto _ : state) {
        QByteArray bytes;
        benchmark::DoNotOptimize(stream.SaveTo(bytes));
    }
    state.SetComplexityN(count);
}
BENCHMARK(BM_SaveSharedResources)->RangeMultiplier(4)->Range(1024, 65535)->Complexity(benchmark::oN);

void BM_LoadResources(benchmark::State &state)
{
    const int count = int(state.range(0));
    ResourceStream source = MakeTable(count, count);
    QByteArray bytes;
    source.SaveTo(bytes);
    for (auto _ : state) {
        ResourceStream stream;
        benchmark::DoNotOptimize(stream.LoadFrom(bytes));
    }
    state.SetComplexityN(count);
    state.SetBytesProcessed(qint64(state.iterations()) * bytes.size());
}
BENCHMARK(BM_LoadResources)->RangeMultiplier(4)->Range(1024, 65535)->Complexity(benchmark::oN);

void BM_ListTarMembers(benchmark::State &state)
{
    const int count = int(state.range(0));
    QTemporaryDir dir;
    const QString path = dir.filePath(QStringLiteral("bench.tar"));
    Tar writer;
    writer.SetModificationTime(1700000000);
    for (int i = 0; i < count; ++i)
        writer.AddFile(QStringLiteral("pkg/member%1.bin").arg(i), QByteArray(700, char(i)));
    if (!writer.Write(path)) {
        state.SkipWithError("cannot write the archive");
        return;
    }
    for (auto _ : state) {
        Tar tar;
        benchmark::DoNotOptimize(tar.Open(QIODevice::ReadOnly, path));
        benchmark::DoNotOptimize(tar.EntryCount());
    }
    state.SetComplexityN(count);
}
BENCHMARK(BM_ListTarMembers)->RangeMultiplier(4)->Range(64, 4096)->Complexity(benchmark::oN);

} // namespace
