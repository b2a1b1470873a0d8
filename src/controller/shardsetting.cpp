#include "controller/shardsetting.h"

#include "controller/shardplan.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QProcessEnvironment>

#include <optional>

namespace {

const QString kBazelIndex = QStringLiteral("TEST_SHARD_INDEX");
const QString kBazelTotal = QStringLiteral("TEST_TOTAL_SHARDS");
const QString kBazelStatus = QStringLiteral("TEST_SHARD_STATUS_FILE");
const QString kGitLabIndex = QStringLiteral("CI_NODE_INDEX");
const QString kGitLabTotal = QStringLiteral("CI_NODE_TOTAL");
const QString kKubernetesIndex = QStringLiteral("JOB_COMPLETION_INDEX");
const QString kIndexOption = QStringLiteral("--shard-index");
const QString kCountOption = QStringLiteral("--shard-count");

// A non-negative decimal number without sign or blanks; nullopt when the text
// is anything else or too large for an int.
std::optional<int> Number(const QString &text)
{
    if (text.isEmpty() || text.size() > 9)
        return std::nullopt;
    for (const QChar c : text) {
        if (c < QLatin1Char('0') || c > QLatin1Char('9'))
            return std::nullopt;
    }
    return text.toInt();
}

// One engine's view: what it names, each part optional.
struct Claim
{
    QString indexName;
    QString countName;
    std::optional<int> index; // 0-based
    std::optional<int> count;
};

class Reader
{
public:
    Reader(const QMap<QString, QString> &environment, QString *error) : m_environment(environment), m_error(error) { }

    bool Has(const QString &name) const { return !m_environment.value(name).isEmpty(); }

    // The variable's number; false with a message when it is set but is not one.
    bool Read(const QString &name, std::optional<int> &value)
    {
        if (!Has(name))
            return true;
        value = Number(m_environment.value(name));
        if (!value)
            return Fail(QStringLiteral("%1=%2 is not a shard number").arg(name, m_environment.value(name)));
        return true;
    }

    bool Fail(const QString &message)
    {
        *m_error = message;
        return false;
    }

private:
    const QMap<QString, QString> &m_environment;
    QString *m_error;
};

} // namespace

bool ShardSetting::Resolve(const QString &indexOption, const QString &countOption,
                           const QMap<QString, QString> &environment, bool indexRequired, ShardSetting *setting,
                           QString *error)
{
    QString ignored;
    if (!error)
        error = &ignored;
    Reader reader(environment, error);
    *setting = ShardSetting();
    setting->statusFile = environment.value(kBazelStatus);

    std::optional<int> optionIndex;
    std::optional<int> optionCount;
    if (!indexOption.isEmpty() && !(optionIndex = Number(indexOption)))
        return reader.Fail(QStringLiteral("%1 %2 is not a shard number").arg(kIndexOption, indexOption));
    if (!countOption.isEmpty() && !(optionCount = Number(countOption)))
        return reader.Fail(QStringLiteral("%1 %2 is not a number of shards").arg(kCountOption, countOption));

    // What each engine that left its variables here says.
    QList<Claim> claims;
    if (!optionIndex || !optionCount) {
        Claim bazel{kBazelIndex, kBazelTotal, {}, {}};
        if (!reader.Read(kBazelIndex, bazel.index) || !reader.Read(kBazelTotal, bazel.count))
            return false;
        if (bazel.index.has_value() != bazel.count.has_value())
            return reader.Fail(
                QStringLiteral("%1 is set without %2")
                    .arg(bazel.index ? kBazelIndex : kBazelTotal, bazel.index ? kBazelTotal : kBazelIndex));
        if (bazel.index)
            claims.append(bazel);

        Claim gitlab{kGitLabIndex, kGitLabTotal, {}, {}};
        if (!reader.Read(kGitLabIndex, gitlab.index) || !reader.Read(kGitLabTotal, gitlab.count))
            return false;
        // GitLab sets CI_NODE_TOTAL=1 on every job that is not parallel.
        if (gitlab.index || gitlab.count.value_or(1) != 1) {
            if (!gitlab.index || !gitlab.count)
                return reader.Fail(
                    QStringLiteral("%1 is set without %2")
                        .arg(gitlab.index ? kGitLabIndex : kGitLabTotal, gitlab.index ? kGitLabTotal : kGitLabIndex));
            if (*gitlab.index < 1 || *gitlab.index > *gitlab.count)
                return reader.Fail(QStringLiteral("%1=%2 is outside 1..%3 (%4)")
                                       .arg(kGitLabIndex)
                                       .arg(*gitlab.index)
                                       .arg(*gitlab.count)
                                       .arg(kGitLabTotal));
            gitlab.index = *gitlab.index - 1;
            claims.append(gitlab);
        }

        Claim kubernetes{kKubernetesIndex, kCountOption, {}, optionCount};
        if (!reader.Read(kKubernetesIndex, kubernetes.index))
            return false;
        if (kubernetes.index) {
            if (!optionCount)
                return reader.Fail(
                    QStringLiteral("%1 is set: give the number of shards with %2").arg(kKubernetesIndex, kCountOption));
            claims.append(kubernetes);
        }
    }

    for (qsizetype i = 1; i < claims.size(); ++i) {
        const Claim &first = claims.first();
        const Claim &other = claims.at(i);
        if (first.index != other.index || first.count != other.count)
            return reader.Fail(QStringLiteral("%1/%2 (shard %3 of %4) and %5/%6 (shard %7 of %8) disagree")
                                   .arg(first.indexName, first.countName)
                                   .arg(*first.index)
                                   .arg(*first.count)
                                   .arg(other.indexName, other.countName)
                                   .arg(*other.index)
                                   .arg(*other.count));
    }

    if (optionIndex) {
        setting->index = *optionIndex;
        setting->from = kIndexOption;
    } else if (!claims.isEmpty()) {
        setting->index = *claims.first().index;
        setting->from = claims.first().indexName;
    }
    if (optionCount)
        setting->count = *optionCount;
    else if (!claims.isEmpty())
        setting->count = *claims.first().count;
    else if (optionIndex)
        return reader.Fail(QStringLiteral("%1 needs %2").arg(kIndexOption, kCountOption));
    setting->sharded = optionIndex || optionCount || !claims.isEmpty();
    if (!setting->sharded)
        return true;

    if (setting->count < 1 || setting->count > ShardPlan::kMaxShards)
        return reader.Fail(QStringLiteral("the number of shards must be 1 to %1, not %2")
                               .arg(ShardPlan::kMaxShards)
                               .arg(setting->count));
    if (setting->index >= setting->count)
        return reader.Fail(QStringLiteral("shard index %1 (%2) is not below the number of shards %3")
                               .arg(setting->index)
                               .arg(setting->from)
                               .arg(setting->count));
    if (indexRequired && setting->index < 0)
        return reader.Fail(QStringLiteral("%1 needs %2 (or one of %3, %4, %5)")
                               .arg(kCountOption, kIndexOption, kBazelIndex, kGitLabIndex, kKubernetesIndex));
    return true;
}

QMap<QString, QString> ShardSetting::ProcessEnvironment()
{
    const QProcessEnvironment process = QProcessEnvironment::systemEnvironment();
    QMap<QString, QString> environment;
    for (const QString &name : {kBazelIndex, kBazelTotal, kBazelStatus, kGitLabIndex, kGitLabTotal, kKubernetesIndex}) {
        if (process.contains(name))
            environment.insert(name, process.value(name));
    }
    return environment;
}

bool ShardSetting::TouchStatusFile(QString *error) const
{
    if (statusFile.isEmpty() || QFileInfo::exists(statusFile))
        return true;
    QDir().mkpath(QFileInfo(statusFile).absolutePath());
    QFile file(statusFile);
    if (!file.open(QIODevice::WriteOnly)) {
        if (error)
            *error = QStringLiteral("cannot create %1 (%2): %3").arg(statusFile, kBazelStatus, file.errorString());
        return false;
    }
    return true;
}
