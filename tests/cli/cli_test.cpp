#include "cli_test.h"

#include <QProcess>

ToolResult RunTool(const QStringList &arguments, const QProcessEnvironment &environment,
                   const QString &workingDirectory)
{
    ToolResult result;
    QProcess process;
    process.setProcessEnvironment(environment);
    if (!workingDirectory.isEmpty())
        process.setWorkingDirectory(workingDirectory);
    process.start(QStringLiteral(HARNESS_BINARY_DIR "/harness"), arguments);
    if (!process.waitForStarted(30000))
        return result;
    process.closeWriteChannel();
    process.waitForFinished(300000);
    result.out = process.readAllStandardOutput();
    result.err = process.readAllStandardError();
    result.status = process.exitStatus() == QProcess::NormalExit ? process.exitCode() : -1;
    return result;
}
