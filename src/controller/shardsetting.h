#pragma once

#include "../common/export.h"

#include <QMap>
#include <QString>

// Which shard of a selection this process runs, from the tool's options or
// from the variables that job engines set:
//   TEST_SHARD_INDEX / TEST_TOTAL_SHARDS   Bazel, GoogleTest (0-based); a
//                                          TEST_SHARD_STATUS_FILE is touched
//                                          to say that sharding is understood
//   CI_NODE_INDEX / CI_NODE_TOTAL          GitLab CI parallel jobs (1-based)
//   JOB_COMPLETION_INDEX                   Kubernetes Indexed Jobs (0-based;
//                                          the count comes from --shard-count)
// An option wins over every variable. Variables of two engines that are both
// set must name the same shard.
struct HARNESS_EXPORT ShardSetting
{
    bool sharded = false; // a shard index or count was given at all
    int index = -1; // 0-based; -1 when only a count was given
    int count = 1; // how many shards; 1 when none was given
    QString from; // what gave the index ("--shard-index", "CI_NODE_INDEX", ...)
    QString statusFile; // TEST_SHARD_STATUS_FILE, when set

    // indexOption and countOption are the option texts (empty when not
    // given); environment maps variable names to values (an empty value
    // counts as unset). With indexRequired, a count without any index is an
    // error. Returns false with a message for the user in *error when a value
    // is not a number, the index is not below the count, the count is below 1
    // or above the largest plan, an index comes without a count, or two
    // engines disagree.
    static bool Resolve(const QString &indexOption, const QString &countOption,
                        const QMap<QString, QString> &environment, bool indexRequired, ShardSetting *setting,
                        QString *error);

    // The variables Resolve reads, taken from the process environment.
    static QMap<QString, QString> ProcessEnvironment();

    // Creates statusFile (empty) when it is set and missing, so that Bazel
    // knows the shard ran only its share. False with *error when it cannot.
    bool TouchStatusFile(QString *error) const;
};
