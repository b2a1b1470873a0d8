#pragma once

#include "../common/export.h"

#include <QList>
#include <QString>

// Splits one selection of modules into N shards that several hosts run
// independently. The split depends only on the selection, N and the
// expected durations, so every host computes the same plan and no host has
// to talk to another: modules are taken longest first (ties by lower-cased
// name, then name, then source) and each goes to the shard with the least
// expected time so far (ties to the lowest index).
//
//     QList<ShardPlan::Module> selection = ...;   // in run order
//     ShardPlan plan = ShardPlan::Make(selection, count);
//     for (const ShardPlan::Entry &entry : plan.Shard(index)) ...
class HARNESS_EXPORT ShardPlan
{
public:
    // One module of the selection; expectedMs < 0 when nothing is known of it.
    struct Module
    {
        QString name; // the module's name
        QString source; // "KVK" or "PVS"
        int testCases = 0; // how many test cases it has
        qint64 expectedMs = -1; // its expected wall time in milliseconds; -1 when unknown
    };

    // Where one module goes and the time the split counted for it.
    struct Entry
    {
        QString name; // the module's name
        QString source; // "KVK" or "PVS"
        int shard = 0; // the 0-based index of the shard it goes to
        qint64 expectedMs = 0; // the milliseconds the split counted for it
        bool estimated = false; // from its test cases, not from recorded runs
    };

    // Time per test case of a module without history when no module of the
    // selection has any either.
    static constexpr qint64 kDefaultMsPerTestCase = 5000;
    // More shards than this is a mistake, not a lab.
    static constexpr int kMaxShards = 10000;

    // Assigns every module of the selection to one of shardCount shards
    // (clamped to 1..kMaxShards). A module listed twice (same name in any
    // letter case, same source) is planned once. A module without history is
    // counted as its test cases (at least one) times the median time per test
    // case of the modules with history, or kDefaultMsPerTestCase when none
    // has any.
    static ShardPlan Make(const QList<Module> &selection, int shardCount);

    // The number of shards, 1..kMaxShards.
    int ShardCount() const { return m_shardCount; }
    // Every module once, in selection order.
    const QList<Entry> &Modules() const { return m_entries; }
    // The modules of one shard, in selection order; empty for an index out
    // of range.
    QList<Entry> Shard(int index) const;
    // The expected milliseconds of one shard; 0 for an index out of range.
    qint64 ShardMs(int index) const;
    // The expected milliseconds of the longest shard.
    qint64 LongestShardMs() const;
    // The expected milliseconds of a shard on average.
    double MeanShardMs() const;

    // The plan as text for people: with index in range that shard only,
    // otherwise every shard, each with its modules and expected time.
    QString Format(int index = -1) const;

    // "850 ms", "12.4 s", "1:02:05".
    static QString FormatDuration(qint64 ms);

private:
    int m_shardCount = 1;
    QList<Entry> m_entries;
    QList<qint64> m_shardMs;
};
