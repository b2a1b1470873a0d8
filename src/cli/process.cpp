// The process command: saved logs recorded again, without a handset.

#include "cli/commands.h"
#include "cli/options.h"
#include "cli/report.h"
#include "cli/setup.h"

#include "controller/harness.h"
#include "log/log.h"

#include <QDirIterator>
#include <QFileInfo>

namespace {

// Any file below folder that processing would read as a log.
bool HasLogs(const QString &folder)
{
    QDirIterator it(folder, {QStringLiteral("*.oat"), QStringLiteral("*.log"), QStringLiteral("*.txt")}, QDir::Files,
                    QDirIterator::Subdirectories);
    return it.hasNext();
}

int ProcessCommand(const QStringList &arguments)
{
    const QString command = arguments.at(0);
    QCommandLineParser parser;
    parser.setApplicationDescription(QStringLiteral(
        "Turns saved logs into processed results again, without a handset: every log below the log "
        "folder (sub-folders too) is recorded in one processed-results file, then summarised as 'report' "
        "does.\nExit status 1 when a test case failed."));
    SetupOptions setup;
    setup.AddTo(parser);
    const QCommandLineOption logDir(QStringLiteral("log-dir"), QStringLiteral("The folder of saved logs."),
                                    QStringLiteral("DIR"));
    const QCommandLineOption results(
        QStringLiteral("results"),
        QStringLiteral("The processed-results file (default: DIR/ProcessedResults/ProcessedResults.xml)."),
        QStringLiteral("FILE"));
    parser.addOptions({logDir, results, JUnitOption(), JsonOption(), HtmlOption()});
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 0, 0))
        return status;
    if (!parser.isSet(logDir) || !QFileInfo(parser.value(logDir)).isDir()) {
        return Refuse(command, QStringLiteral("--log-dir must name a folder of saved logs"));
    }
    const QString logs = QFileInfo(parser.value(logDir)).absoluteFilePath();
    if (!HasLogs(logs)) {
        return Refuse(command, QStringLiteral("no logs (*.log, *.txt, *.oat) below %1").arg(logs));
    }
    QString error;
    if (parser.isSet(results) && !CheckOutputPath(parser.value(results), &error)) {
        return Refuse(command, QStringLiteral("cannot write --results %1: %2").arg(parser.value(results), error));
    }
    if (!setup.Check(parser, command) || !CheckReportOutputs(parser, command))
        return ExitUsage;

    Harness harness;
    Log log;
    setup.Apply(parser, harness, log);
    harness.SetLogOutputPath(logs);
    if (parser.isSet(results))
        harness.SetProcessedResultsPath(QFileInfo(parser.value(results)).absoluteFilePath());
    {
        const EchoToStandardError echo;
        if (!harness.Process(0)) {
            Err(command + QStringLiteral(": the logs could not be processed (see the log)\n"));
            return ExitUsage;
        }
    }
    const QString resultsPath = harness.GetProcessedResultsPath();
    RunReport report;
    if (!report.Read(resultsPath, &error)) {
        return Refuse(command, QStringLiteral("no log below %1 was recognised (%2)").arg(logs, error));
    }
    report.DropNotExecuted();
    status = PublishReport(report, parser, false);
    Out(QStringLiteral("Processed results: %1\n").arg(resultsPath));
    if (status != ExitSuccess)
        return status;
    return report.Total(QStringLiteral("fail")) > 0 ? ExitTestFailed : ExitSuccess;
}

} // namespace

QList<Command> ProcessCommands()
{
    return {
        {"process", "Process saved logs again into a processed-results file", ProcessCommand},
    };
}
