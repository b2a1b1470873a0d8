#pragma once

#include "../controller/shardsetting.h"

#include <QCommandLineOption>
#include <QCommandLineParser>
#include <QList>
#include <QMap>
#include <QSharedPointer>
#include <QString>

class _TestModule;

// The options of `harness run` that split a selection between hosts:
// --shard-index I, --shard-count N, --timings FILE (repeatable) and --plan.
struct ShardOptions
{
    QCommandLineOption index{QStringLiteral("shard-index"),
                             QStringLiteral("Run shard I (0-based) of the selection (default: TEST_SHARD_INDEX, "
                                            "CI_NODE_INDEX - 1 or JOB_COMPLETION_INDEX)."),
                             QStringLiteral("I")};
    QCommandLineOption count{QStringLiteral("shard-count"),
                             QStringLiteral("Split the selection into N shards (default: TEST_TOTAL_SHARDS or "
                                            "CI_NODE_TOTAL)."),
                             QStringLiteral("N")};
    QCommandLineOption timings{QStringLiteral("timings"),
                               QStringLiteral("Recorded module times (Timings.json of earlier runs) to balance the "
                                              "shards by; give every host the same files."),
                               QStringLiteral("FILE")};
    QCommandLineOption plan{QStringLiteral("plan"),
                            QStringLiteral("Print which modules go to which shard and each shard's expected time, "
                                           "and run nothing.")};

    void AddTo(QCommandLineParser &parser) const { parser.addOptions({index, count, timings, plan}); }

    // Narrows modules (the whole selection, the same on every host) to this
    // process's shard, or prints the plan. Returns -1 when the run should go
    // on with modules; otherwise the exit status to end with: 0 once the
    // plan is printed or when this shard holds no module, 2 after a usage error or an unreadable timings file
    // (one line on standard error, prefixed with command). Without any
    // shard option or variable the modules are left as they are.
    int Apply(const QCommandLineParser &parser, const QString &command, QList<QSharedPointer<_TestModule>> &modules,
              const QMap<QString, QString> &environment = ShardSetting::ProcessEnvironment()) const;
};
