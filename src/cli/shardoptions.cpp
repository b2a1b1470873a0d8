#include "cli/shardoptions.h"

#include "cli/commands.h"

#include "catalogue/testmodule.h"
#include "controller/moduletimings.h"
#include "controller/shardplan.h"

#include <QSet>

int ShardOptions::Apply(const QCommandLineParser &parser, const QString &command,
                        QList<QSharedPointer<_TestModule>> &modules, const QMap<QString, QString> &environment) const
{
    ShardSetting setting;
    QString error;
    const bool planOnly = parser.isSet(plan);
    if (!ShardSetting::Resolve(parser.value(index), parser.value(count), environment, !planOnly, &setting, &error)) {
        return Refuse(command, error);
    }
    if (!setting.sharded && !planOnly)
        return -1;

    // Only the files given count: a host's own records differ from the
    // others', and the hosts must all plan the same split.
    ModuleTimings recorded;
    for (const QString &path : parser.values(timings)) {
        if (!recorded.Merge(path)) {
            return Refuse(command, recorded.ErrorString());
        }
    }
    QList<ShardPlan::Module> selection;
    for (const QSharedPointer<_TestModule> &module : std::as_const(modules))
        selection.append({module->moduleName, module->Source(), int(module->testCases.size()),
                          recorded.ExpectedMs(module->moduleName, module->Source())});
    const ShardPlan shards = ShardPlan::Make(selection, setting.count);
    if (planOnly) {
        Out(shards.Format(setting.index));
        return ExitSuccess;
    }

    if (!setting.TouchStatusFile(&error)) {
        return Refuse(command, error);
    }
    QSet<QString> mine;
    for (const ShardPlan::Entry &entry : shards.Shard(setting.index))
        mine.insert(entry.source + QLatin1Char('/') + entry.name.toLower());
    QList<QSharedPointer<_TestModule>> kept;
    for (const QSharedPointer<_TestModule> &module : std::as_const(modules)) {
        if (mine.remove(module->Source() + QLatin1Char('/') + module->moduleName.toLower()))
            kept.append(module);
    }
    modules = kept;
    if (modules.isEmpty()) {
        // More shards than modules: this one has nothing to do, which is no failure.
        Out(QStringLiteral("Shard %1 of %2 holds no module of this selection: nothing to run.\n")
                .arg(setting.index)
                .arg(setting.count));
        return ExitSuccess;
    }
    return -1;
}
