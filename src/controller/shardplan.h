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
        QString name;
        QString source;  // "KVK" or "PVS"
        int testCases = 0;
        qint64 expectedMs = -1;
    };

    // Where one module goes and the time the split counted for it.
    struct Entry
    {
        QString name;
        QString source;
        int shard = 0;
        qint64 expectedMs = 0;
        bool estimated = false;  // from its test cases, not from recorded runs
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

    int ShardCount() const { return m_shardCount; }
    // Every module once, in selection order.
    const QList<Entry> &Modules() const { return m_entries; }
    // The modules of one shard, in selection order; empty for an index out
    // of range.
    QList<Entry> Shard(int index) const;
    qint64 ShardMs(int index) const;
    qint64 LongestShardMs() const;
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
