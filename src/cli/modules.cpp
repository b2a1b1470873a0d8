// The modules and manifest commands: the catalogues of the kit and platform.

#include "cli/commands.h"
#include "cli/options.h"
#include "cli/setup.h"

#include "catalogue/testmodule.h"
#include "controller/harness.h"
#include "environment/platforms.h"
#include "log/log.h"

#include <QDir>
#include <QFileInfo>

namespace {

int ModulesCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(QStringLiteral(
        "Lists the selectable test modules of the kit and platform catalogues: name, test type, family, "
        "sub-family, source and number of test cases. PATTERN may start or end with '*'; each must match "
        "a module."));
    SetupOptions setup;
    SelectionOptions selection;
    setup.AddTo(parser);
    selection.AddTo(parser);
    parser.addPositionalArgument(QStringLiteral("PATTERN"), QStringLiteral("Module name patterns."),
                                 QStringLiteral("[PATTERN...]"));
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status))
        return status;
    if (!setup.Check(parser, arguments.at(0)) || !selection.Check(parser, arguments.at(0)))
        return ExitUsage;
    Harness harness;
    Log log;
    setup.Apply(parser, harness, log);
    QList<QSharedPointer<_TestModule>> modules;
    {
        const EchoToStandardError quiet(true);
        if (!selection.Select(harness, parser, arguments.at(0), modules))
            return ExitUsage;
    }
    QString text = QStringLiteral("Name\tType\tFamily\tSubfamily\tSource\tTest cases\n");
    for (const QSharedPointer<_TestModule> &m : modules)
        text += QStringLiteral("%1\t%2\t%3\t%4\t%5\t%6\n")
                    .arg(m->moduleName, m->TestType(), m->family, m->subFamily, m->Source())
                    .arg(m->testCases.size());
    Out(text);
    return ExitSuccess;
}

// The file names of the two catalogues in the folder that -o names.
const QString kKitCatalogue = QStringLiteral("KVKManifest.xml");
const QString kPlatformCatalogue = QStringLiteral("PlatformManifest.xml");

int ManifestCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(
        QStringLiteral(
            "Scans the test kit and the platform again and writes their catalogues: to their caches, or with "
            "-o into the folder DIR, the kit's as %1 and the platform's as %2.")
            .arg(kKitCatalogue, kPlatformCatalogue));
    SetupOptions setup;
    setup.AddTo(parser);
    const QCommandLineOption output({QStringLiteral("o"), QStringLiteral("output")},
                                    QStringLiteral("Write the catalogues into the folder DIR (created when missing)."),
                                    QStringLiteral("DIR"));
    parser.addOption(output);
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 0, 0))
        return status;
    if (!setup.Check(parser, arguments.at(0)))
        return ExitUsage;
    QString folder;
    if (parser.isSet(output)) {
        folder = QFileInfo(parser.value(output)).absoluteFilePath();
        if (QFileInfo::exists(folder) && !QFileInfo(folder).isDir()) {
            Err(arguments.at(0)
                + QStringLiteral(": -o names a folder for both catalogues; %1 is a file\n").arg(folder));
            return ExitUsage;
        }
        if (!QDir().mkpath(folder)) {
            Err(arguments.at(0) + QStringLiteral(": cannot create the folder %1\n").arg(folder));
            return ExitUsage;
        }
    }
    const bool kitAsked = parser.isSet(setup.kit) || !parser.isSet(setup.platform);
    const bool platformAsked = parser.isSet(setup.platform) || !parser.isSet(setup.kit);

    // One Harness per catalogue, so that each is written to its own file.
    Log log;
    log.SetLogPath(setup.LogPath(parser));
    log.SetVerbose(parser.isSet(setup.verbose));
    const EchoToStandardError echo;
    const auto generate = [&](bool platform, const QString &name) {
        Harness harness;
        harness.SetLogger(&log);
        if (platform) {
            harness.SetPlatform(parser.isSet(setup.platform) ? parser.value(setup.platform) : QStringLiteral("*"));
        } else {
            harness.SetTestkit(parser.isSet(setup.kit) ? parser.value(setup.kit) : QStringLiteral("*"));
        }
        const QString path = folder.isEmpty() ? QString() : folder + QLatin1Char('/') + name;
        if (!harness.GenerateManifest(path))
            return false;
        if (!path.isEmpty())
            Out(QStringLiteral("%1 catalogue: %2\n")
                    .arg(platform ? QStringLiteral("Platform") : QStringLiteral("Kit"), path));
        return true;
    };
    bool ok = true;
    if (kitAsked && !generate(false, kKitCatalogue)) {
        Err(arguments.at(0) + QStringLiteral(": the kit catalogue could not be generated (see the log)\n"));
        ok = false;
    }
    // Without --platform a platform is scanned only when one is installed.
    if (platformAsked && (parser.isSet(setup.platform) || !GetPlatformSetting().isEmpty())
        && !generate(true, kPlatformCatalogue)) {
        Err(arguments.at(0) + QStringLiteral(": the platform catalogue could not be generated (see the log)\n"));
        ok = false;
    }
    return ok ? ExitSuccess : ExitUsage;
}

} // namespace

QList<Command> ModuleCommands()
{
    return {
        {"modules", "List the selectable test modules", ModulesCommand},
        {"manifest", "Regenerate the kit and platform catalogues", ManifestCommand},
    };
}
