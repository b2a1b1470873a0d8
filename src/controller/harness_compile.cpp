// Resource compilation: the SDK's resource compilers run as child processes,
// started with an argument list (never through a shell), so that any file
// name reaches them unchanged.

#include "controller/harness.h"

#include "common/clock.h"
#include "environment/platforms.h"

#include <QFile>
#include <QFileInfo>
#include <QProcess>

namespace {

const QString kCompilerTool = QStringLiteral("/bin/kestormc.exe");
const QString kAltCompilerTool = QStringLiteral("/bin/deprecated/ResourceEditor/kestorc.exe");
const QString kKsxSuffix = QStringLiteral(".ksx");
const QString kCarSuffix = QStringLiteral(".car");
const QByteArray kConvertedText("Successfully converted file");
const QByteArray kCompiledText("Successfully compiled");

// Output is read in lines of at most 1023 bytes, as a 1024-byte line buffer
// reads them; a longer line arrives in pieces.
constexpr qint64 kLineBufferSize = 1024;
// How long the older compiler may take before its result is judged.
constexpr qint64 kAltCompileWaitMs = 30000;
// The current compiler has no timeout of its own; this bound only keeps a
// compiler that never ends from blocking the caller for good.
constexpr qint64 kCompileLimitMs = 600000;
// Waits on a child process are cut into slices measured on the clock.
constexpr qint64 kWaitSliceMs = 1000;
constexpr int kKillWaitMs = 5000;

int WaitSlice(const Clock::Timer &timer, qint64 limitMs)
{
    return int(qBound<qint64>(0, limitMs - timer.Elapsed(), kWaitSliceMs));
}

// Starts tool with arguments and no standard input; false when it cannot be
// started (missing, not executable).
bool StartTool(QProcess &process, const QString &tool, const QStringList &arguments)
{
    process.setProgram(tool);
    process.setArguments(arguments);
    process.start(QIODevice::ReadOnly);
    if (!process.waitForStarted())
        return false;
    process.closeWriteChannel();
    return true;
}

// Waits until the process has ended, at most limitMs from the start of
// timer; a process still running then is killed. True when it ended in time.
bool FinishTool(QProcess &process, const Clock::Timer &timer, qint64 limitMs)
{
    while (process.state() != QProcess::NotRunning) {
        if (timer.Elapsed() >= limitMs) {
            process.kill();
            process.waitForFinished(kKillWaitMs);
            return false;
        }
        process.waitForFinished(WaitSlice(timer, limitMs));
    }
    return true;
}

// One line of compiler output as text; a "\r\n" ending reads as "\n".
QString LineText(QByteArray line)
{
    if (line.endsWith("\r\n"))
        line.remove(line.size() - 2, 1);
    return QString::fromLocal8Bit(line);
}

// Runs the current compiler and collects the output lines that contain
// marker, reading standard output line by line until its end or, with
// firstOnly, until the first such line. Standard error passes through to
// ours. Nothing is collected when the tool cannot start.
QStringList RunCompiler(const QString &tool, const QStringList &arguments, const QByteArray &marker, bool firstOnly)
{
    QStringList matches;
    QProcess process;
    process.setProcessChannelMode(QProcess::ForwardedErrorChannel);
    if (!StartTool(process, tool, arguments))
        return matches;

    const Clock::Timer timer;
    bool reading = true;
    while (reading) {
        while (process.canReadLine() || process.bytesAvailable() >= kLineBufferSize - 1
               || (process.state() == QProcess::NotRunning && process.bytesAvailable() > 0)) {
            const QByteArray line = process.readLine(kLineBufferSize);
            if (line.contains(marker)) {
                matches.append(LineText(line));
                if (firstOnly) {
                    reading = false;
                    break;
                }
            }
        }
        if (!reading || process.state() == QProcess::NotRunning || timer.Elapsed() >= kCompileLimitMs)
            break;
        // A tool that closed its output but goes on running is waited for
        // rather than polled.
        if (!process.waitForReadyRead(WaitSlice(timer, kCompileLimitMs)))
            process.waitForFinished(WaitSlice(timer, kCompileLimitMs));
    }
    FinishTool(process, timer, kCompileLimitMs);
    return matches;
}

} // namespace

bool Harness::CompileResource(const QString &source, const QString &output)
{
    const QString tool = GetToolsetSetting() + kCompilerTool;

    QString input = source;
    QString intermediate;
    if (source.endsWith(kKsxSuffix, Qt::CaseInsensitive)) {
        const QString car = source.left(source.size() - kKsxSuffix.size()) + kCarSuffix;
        const QStringList converted = RunCompiler(
            tool, {QStringLiteral("-convert"), QStringLiteral("-infile"), source, QStringLiteral("-outfile"), car},
            kConvertedText, false);
        for (const QString &line : converted)
            LogMessage(line, true);
        if (!converted.isEmpty())
            input = intermediate = car;
    }

    bool compiled = false;
    if (!input.isEmpty()) {
        const QStringList success = RunCompiler(
            tool, {QStringLiteral("-compile"), QStringLiteral("-infile"), input, QStringLiteral("-outfile"), output},
            kCompiledText, true);
        if (!success.isEmpty()) {
            LogMessage(success.first(), true);
            compiled = true;
        }
    }

    if (!intermediate.isEmpty())
        QFile::remove(intermediate);
    return compiled;
}

bool Harness::AltCompileResource(const QString &source, const QString &output)
{
    const QString tool = GetToolsetSetting() + kAltCompilerTool;

    QProcess process;
    process.setProcessChannelMode(QProcess::MergedChannels);
    bool finished = false;
    if (StartTool(process, tool, {QStringLiteral("-nh"), QStringLiteral("-o"), output, source})) {
        // A compiler killed at the deadline may have left half a file, which
        // must not pass for a compiled device pack.
        finished = FinishTool(process, Clock::Timer(), kAltCompileWaitMs);
    }
    const QString collected = QString::fromLocal8Bit(process.readAll());

    if (finished && QFileInfo(output).size() > 0)
        return true;

    LogMessage(QStringLiteral("Device Pack Compiliation failed.\n") + QStringLiteral("\tCommand:\"") + tool
                   + QStringLiteral("\"-nh -o ") + output + QLatin1Char(' ') + source + QStringLiteral("\n\n")
                   + collected,
               true);
    return false;
}
