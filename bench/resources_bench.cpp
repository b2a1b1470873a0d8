// Saving and loading resource files and reading tar archives: each should
// grow linearly with the number of resources or members.
#include "archive/tar.h"
#include "resources/resourcestream.h"

#include <QFile>
#include <QTemporaryDir>

#include "support/benchutil.h"

#include <benchmark/benchmark.h>

#include <map>
#include <memory>

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

// Resource files as modules ship them, at the size limit of the format: a
// third of the blocks repeat an earlier one. Saved to and loaded from a file,
// against writing and reading the same bytes with QFile (the I/O alone).
ResourceStream MakeFileTable(int count)
{
    ResourceStream stream;
    for (int i = 0; i < count; ++i) {
        const int key = i % 3 == 2 ? i / 3 : i;
        QByteArray block = QByteArrayLiteral("\x02resource text ") + QByteArray::number(key);
        stream.AddResource(quint16(1 + i / 16384), quint16(i % 16384), block.repeated(1 + key % 4));
    }
    return stream;
}

struct ResourceFile
{
    QTemporaryDir dir;
    QString path;
    QByteArray bytes;
};

const ResourceFile &FileOf(int count)
{
    static std::map<int, std::unique_ptr<ResourceFile>> files;
    std::unique_ptr<ResourceFile> &file = files[count];
    if (!file) {
        file = std::make_unique<ResourceFile>();
        file->path = file->dir.filePath(QStringLiteral("table.kar"));
        ResourceStream stream = MakeFileTable(count);
        if (stream.Save(file->path)) {
            QFile in(file->path);
            if (in.open(QIODevice::ReadOnly))
                file->bytes = in.readAll();
        }
    }
    return *file;
}

void BM_SaveResourceFile(benchmark::State &state)
{
    const int count = int(state.range(0));
    ResourceStream stream = MakeFileTable(count);
    QTemporaryDir dir;
    const QString path = dir.filePath(QStringLiteral("out.kar"));
    for (auto _ : state) {
        if (!stream.Save(path)) {
            state.SkipWithError("cannot save the resource file");
            break;
        }
    }
    state.SetComplexityN(count);
}

void BM_WriteFileBaseline(benchmark::State &state)
{
    const int count = int(state.range(0));
    const QByteArray bytes = FileOf(count).bytes;
    QTemporaryDir dir;
    const QString path = dir.filePath(QStringLiteral("out.kar"));
    for (auto _ : state) {
        QFile file(path);
        if (!file.open(QIODevice::WriteOnly | QIODevice::Truncate) || file.write(bytes) != bytes.size()) {
            state.SkipWithError("cannot write the file");
            break;
        }
    }
    state.SetComplexityN(count);
}

void BM_LoadResourceFile(benchmark::State &state)
{
    const int count = int(state.range(0));
    const ResourceFile &file = FileOf(count);
    for (auto _ : state) {
        ResourceStream stream;
        if (!stream.Load(file.path)) {
            state.SkipWithError("cannot load the resource file");
            break;
        }
        benchmark::DoNotOptimize(stream.GetResourceHeader());
    }
    state.SetComplexityN(count);
}

void BM_ReadFileBaseline(benchmark::State &state)
{
    const int count = int(state.range(0));
    const ResourceFile &file = FileOf(count);
    for (auto _ : state) {
        QFile in(file.path);
        if (!in.open(QIODevice::ReadOnly)) {
            state.SkipWithError("cannot read the file");
            break;
        }
        benchmark::DoNotOptimize(in.readAll().constData());
    }
    state.SetComplexityN(count);
}

void ResourceCounts(benchmark::internal::Benchmark *benchmark)
{
    benchmark->Arg(16383)->Arg(65535)->Unit(benchmark::kMillisecond);
    benchutil::SetMinTime(benchmark, 0.2);
}

BENCHMARK(BM_SaveResourceFile)->Apply(ResourceCounts);
BENCHMARK(BM_WriteFileBaseline)->Apply(ResourceCounts);
BENCHMARK(BM_LoadResourceFile)->Apply(ResourceCounts);
BENCHMARK(BM_ReadFileBaseline)->Apply(ResourceCounts);

} // namespace
