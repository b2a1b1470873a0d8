// The set-up and selection options shared by the commands that use a Harness.

#include "cli/setup.h"

#include "cli/commands.h"
#include "cli/report.h"

#include "catalogue/testmodule.h"
#include "controller/harness.h"
#include "environment/platforms.h"
#include "environment/testdirectories.h"
#include "log/log.h"

#include <QDir>
#include <QFileInfo>
#include <QProcessEnvironment>
#include <QSet>

#include <algorithm>

namespace {

// A path, or part of the name of one of the entries.
template <typename Record> bool Names(const QString &request, const QList<Record> &records)
{
    if (request == QLatin1String("*") || QFileInfo(request).isDir())
        return true;
    return std::any_of(records.cbegin(), records.cend(),
                       [&](const Record &record) { return record.name.contains(request, Qt::CaseInsensitive); });
}

} // namespace

void SetupOptions::AddTo(QCommandLineParser &parser) const
{
    parser.addOptions({kit, platform, log, verbose});
}

QString SetupOptions::LogPath(const QCommandLineParser &parser) const
{
    const QString path = parser.value(log);
    if (!path.isEmpty())
        return QFileInfo(path).absoluteFilePath();
    return QFileInfo(TestDirectories::GetTestDataPath()).absolutePath() + QStringLiteral("/harness.log");
}

bool SetupOptions::Check(const QCommandLineParser &parser, const QString &command) const
{
    const QProcessEnvironment environment = QProcessEnvironment::systemEnvironment();
    const QString dataRoot = environment.value(QStringLiteral("KESTIX_DATA_ROOT"));
    if (!dataRoot.isEmpty() && QFileInfo::exists(dataRoot) && !QFileInfo(dataRoot).isDir())
        return Fail(command, QStringLiteral("the data root %1 (KESTIX_DATA_ROOT) is not a folder").arg(dataRoot));
    if (!dataRoot.isEmpty() && !QDir().mkpath(dataRoot))
        return Fail(command, QStringLiteral("the data root %1 (KESTIX_DATA_ROOT) cannot be created").arg(dataRoot));
    const QString toolset = GetToolsetSetting();
    if (!toolset.isEmpty() && !QFileInfo(toolset).isDir())
        return Fail(command, QStringLiteral("the tool set %1 (KESTIX_TOOLSET) does not exist").arg(toolset));
    if (parser.isSet(kit)) {
        QList<TestKit> kits;
        Harness::ListTestKits(kits);
        if (!Names(parser.value(kit), kits))
            return Fail(command, QStringLiteral("no test kit '%1' (see 'harness kits')").arg(parser.value(kit)));
    }
    if (parser.isSet(platform)) {
        QList<Platform> platforms;
        GetProPlatforms(platforms);
        if (!Names(parser.value(platform), platforms))
            return Fail(command,
                        QStringLiteral("no platform '%1' (see 'harness platforms')").arg(parser.value(platform)));
    }
    QString error;
    if (parser.isSet(log) && !CheckOutputPath(parser.value(log), &error))
        return Fail(command, QStringLiteral("cannot write the log %1: %2").arg(parser.value(log), error));
    return true;
}

void SetupOptions::Apply(const QCommandLineParser &parser, Harness &harness, Log &logger) const
{
    logger.SetLogPath(LogPath(parser));
    logger.SetVerbose(parser.isSet(verbose));
    harness.SetLogger(&logger);
    if (parser.isSet(kit))
        harness.SetTestkit(parser.value(kit));
    if (parser.isSet(platform))
        harness.SetPlatform(parser.value(platform));
}

void SelectionOptions::AddTo(QCommandLineParser &parser) const
{
    parser.addOptions({family, subFamily, features});
}

bool SelectionOptions::Check(const QCommandLineParser &parser, const QString &command) const
{
    if (parser.isSet(subFamily) && !parser.isSet(family))
        return Fail(command, QStringLiteral("--subfamily needs --family"));
    if (parser.isSet(features)) {
        if (parser.isSet(family) || !parser.positionalArguments().isEmpty())
            return Fail(command,
                        QStringLiteral("--features selects on its own: give no patterns and no --family with it"));
        if (!QFileInfo(parser.value(features)).isFile())
            return Fail(command, QStringLiteral("the feature list %1 does not exist").arg(parser.value(features)));
    }
    return true;
}

bool SelectionOptions::Select(Harness &harness, const QCommandLineParser &parser, const QString &command,
                              QList<QSharedPointer<_TestModule>> &modules, const QStringList *givenPatterns) const
{
    modules.clear();
    if (parser.isSet(features)) {
        harness.GetTestModules(modules, parser.value(features));
        if (modules.isEmpty())
            return Fail(
                command,
                QStringLiteral("no module of the feature list %1 is in the catalogues").arg(parser.value(features)));
        return true;
    }
    const QString wantedFamily = parser.value(family);
    const QString wantedSubFamily = parser.value(subFamily);
    const auto inFamily = [&](const QSharedPointer<_TestModule> &module) {
        return module->family.contains(wantedFamily, Qt::CaseInsensitive)
            && module->subFamily.contains(wantedSubFamily, Qt::CaseInsensitive);
    };
    QString where;
    if (parser.isSet(family))
        where = QStringLiteral(" in family '%1'").arg(wantedFamily)
            + (parser.isSet(subFamily) ? QStringLiteral(", sub-family '%1'").arg(wantedSubFamily) : QString());

    QStringList patterns = givenPatterns ? *givenPatterns : parser.positionalArguments();
    if (patterns.isEmpty())
        patterns.append(QString());
    QSet<QString> seen;
    for (const QString &pattern : std::as_const(patterns)) {
        QList<QSharedPointer<_TestModule>> matches;
        harness.GetTestModules(matches, pattern.isEmpty() ? QStringList() : QStringList{pattern}, wantedFamily,
                               wantedSubFamily);
        bool any = false;
        for (const QSharedPointer<_TestModule> &module : std::as_const(matches)) {
            if (!inFamily(module))
                continue;
            any = true;
            const QString key = module->Source() + QLatin1Char('/') + module->moduleName.toLower();
            if (!seen.contains(key)) {
                seen.insert(key);
                modules.append(module);
            }
        }
        if (!any && !pattern.isEmpty())
            return Fail(command,
                        QStringLiteral("no module matches '%1'%2 (see 'harness modules')").arg(pattern, where));
        if (!any && parser.isSet(family))
            return Fail(command, QStringLiteral("no module%1 (see 'harness modules')").arg(where));
    }
    return true;
}
