#include "controller/shardplan.h"

#include <QHash>

#include <algorithm>
#include <cmath>
#include <functional>
#include <queue>
#include <utility>
#include <vector>

namespace {

double Median(std::vector<double> values)
{
    std::sort(values.begin(), values.end());
    const size_t middle = values.size() / 2;
    return values.size() % 2 ? values[middle] : (values[middle - 1] + values[middle]) / 2;
}

QString Key(const QString &name, const QString &source)
{
    return source + QLatin1Char('/') + name.toLower();
}

} // namespace

ShardPlan ShardPlan::Make(const QList<Module> &selection, int shardCount)
{
    ShardPlan plan;
    plan.m_shardCount = std::clamp(shardCount, 1, kMaxShards);
    plan.m_shardMs = QList<qint64>(plan.m_shardCount, 0);

    QList<Module> modules;
    QHash<QString, bool> seen;
    std::vector<double> msPerTestCase;
    for (const Module &module : selection) {
        const QString key = Key(module.name, module.source);
        if (seen.contains(key))
            continue;
        seen.insert(key, true);
        modules.append(module);
        if (module.expectedMs >= 0)
            msPerTestCase.push_back(double(module.expectedMs) / std::max(1, module.testCases));
    }
    const double estimate = msPerTestCase.empty() ? double(kDefaultMsPerTestCase) : Median(msPerTestCase);

    for (const Module &module : std::as_const(modules)) {
        Entry entry;
        entry.name = module.name;
        entry.source = module.source;
        entry.estimated = module.expectedMs < 0;
        entry.expectedMs
            = entry.estimated ? qint64(std::llround(estimate * std::max(1, module.testCases))) : module.expectedMs;
        plan.m_entries.append(entry);
    }

    // Longest first; equal times in an order that every host shares.
    std::vector<qsizetype> order(size_t(plan.m_entries.size()));
    for (size_t i = 0; i < order.size(); ++i)
        order[i] = qsizetype(i);
    std::vector<QString> lowered;
    lowered.reserve(order.size());
    for (const Entry &entry : std::as_const(plan.m_entries))
        lowered.push_back(entry.name.toLower());
    std::sort(order.begin(), order.end(), [&](qsizetype a, qsizetype b) {
        const Entry &x = plan.m_entries.at(a);
        const Entry &y = plan.m_entries.at(b);
        if (x.expectedMs != y.expectedMs)
            return x.expectedMs > y.expectedMs;
        if (lowered[size_t(a)] != lowered[size_t(b)])
            return lowered[size_t(a)] < lowered[size_t(b)];
        if (x.name != y.name)
            return x.name < y.name;
        return x.source < y.source;
    });

    using Load = std::pair<qint64, int>; // expected time so far, shard index
    std::priority_queue<Load, std::vector<Load>, std::greater<Load>> loads;
    for (int shard = 0; shard < plan.m_shardCount; ++shard)
        loads.push({0, shard});
    for (const qsizetype index : order) {
        Load least = loads.top();
        loads.pop();
        Entry &entry = plan.m_entries[index];
        entry.shard = least.second;
        least.first += entry.expectedMs;
        plan.m_shardMs[least.second] = least.first;
        loads.push(least);
    }
    return plan;
}

QList<ShardPlan::Entry> ShardPlan::Shard(int index) const
{
    QList<Entry> entries;
    for (const Entry &entry : m_entries) {
        if (entry.shard == index)
            entries.append(entry);
    }
    return entries;
}

qint64 ShardPlan::ShardMs(int index) const
{
    return m_shardMs.value(index, 0);
}

qint64 ShardPlan::LongestShardMs() const
{
    return m_shardMs.isEmpty() ? 0 : *std::max_element(m_shardMs.cbegin(), m_shardMs.cend());
}

double ShardPlan::MeanShardMs() const
{
    double total = 0;
    for (const qint64 ms : m_shardMs)
        total += double(ms);
    return m_shardMs.isEmpty() ? 0 : total / double(m_shardMs.size());
}

QString ShardPlan::FormatDuration(qint64 ms)
{
    if (ms < 1000)
        return QStringLiteral("%1 ms").arg(ms);
    if (ms < 60 * 1000)
        return QStringLiteral("%1 s").arg(double(ms) / 1000, 0, 'f', 1);
    const qint64 seconds = (ms + 500) / 1000;
    return QStringLiteral("%1:%2:%3")
        .arg(seconds / 3600)
        .arg(seconds / 60 % 60, 2, 10, QLatin1Char('0'))
        .arg(seconds % 60, 2, 10, QLatin1Char('0'));
}

QString ShardPlan::Format(int index) const
{
    const bool one = index >= 0 && index < m_shardCount;
    QString text;
    if (!one) {
        text += QStringLiteral("%1 modules in %2 shards; longest shard %3, mean %4\n")
                    .arg(m_entries.size())
                    .arg(m_shardCount)
                    .arg(FormatDuration(LongestShardMs()), FormatDuration(qint64(std::llround(MeanShardMs()))));
    }
    int nameWidth = 6;
    for (const Entry &entry : m_entries)
        nameWidth = std::max(nameWidth, int(entry.name.size()));
    for (int shard = one ? index : 0; shard < (one ? index + 1 : m_shardCount); ++shard) {
        const QList<Entry> entries = Shard(shard);
        text += QStringLiteral("Shard %1 of %2: %3 modules, expected %4\n")
                    .arg(shard)
                    .arg(m_shardCount)
                    .arg(entries.size())
                    .arg(FormatDuration(ShardMs(shard)));
        for (const Entry &entry : entries) {
            text += QStringLiteral("  %1  %2  %3%4\n")
                        .arg(entry.name.leftJustified(nameWidth), entry.source.leftJustified(3))
                        .arg(FormatDuration(entry.expectedMs).rightJustified(9))
                        .arg(entry.estimated ? QStringLiteral("  (estimated from test cases)") : QString());
        }
    }
    return text;
}
