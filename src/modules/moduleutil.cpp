#include "modules/moduleutil.h"

#include "catalogue/testresults.h"
#include "common/clock.h"
#include "device/device.h"
#include "log/log.h"

#include <QDateTime>
#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QTemporaryFile>

#include <utility>

namespace ModuleUtil {

namespace {
constexpr qint64 kSettleMs = 100;
constexpr qint64 kFirstLogDelayMs = 100;
constexpr qint64 kLogDelayStepMs = 100;
constexpr qint64 kMaxLogDelayMs = 2000;
constexpr qint64 kRunDelayStepMs = 50;
constexpr qint64 kMaxRunDelayMs = 1000;
constexpr int kMarksPerLine = 40;
constexpr unsigned int kProgressIndent = 3;
} // namespace

bool StartsWithNoCase(const QString &line, const QString &prefix)
{
    return line.startsWith(prefix, Qt::CaseInsensitive);
}

QString PrefixValue(const QString &line, const QString &prefix)
{
    QString value = line;
    value.remove(prefix, Qt::CaseInsensitive);
    return value.trimmed();
}

bool EndsWithNoCase(const QString &text, const QString &suffix)
{
    return text.endsWith(suffix, Qt::CaseInsensitive);
}

QString TimeStampedName(const QString &fileName)
{
    QString name = fileName;
    return name.replace(QLatin1Char('.'),
                        QDateTime::currentDateTime().toString(QStringLiteral("-yyyy-MM-dd-hh-mm-ss.")));
}

QString DeviceErrorText(unsigned int error)
{
    return QStringLiteral("%1(0x%2)").arg(error).arg(error, 8, 16, QLatin1Char(' '));
}

void StartParse(TestResults &results)
{
    results.manifestName.clear();
    results.caseResults.clear();
    results.timeStamp = QDateTime::currentDateTime();
}

void RecordPair(TestResults &results, QString &testCase, QString &result)
{
    if (testCase.isEmpty() || result.isEmpty())
        return;
    results.caseResults.append(TestCaseResult(testCase, result));
    testCase.clear();
    result.clear();
}

bool ForEachLogLine(const QString &path, const std::function<void(const QString &)> &handle)
{
    // Only plain files: a device or a pipe could feed one endless line.
    if (!QFileInfo(path).isFile())
        return false;
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly))
        return false;
    while (!file.atEnd()) {
        QByteArray line = file.readLine();
        if (line.isEmpty())
            break;
        if (line.endsWith('\n'))
            line.chop(1);
        if (line.endsWith('\r'))
            line.chop(1);
        handle(QString::fromUtf8(line));
    }
    return true;
}

bool WaitWhileRunning(const std::function<bool()> &running, bool growing)
{
    qint64 delay = 1;
    for (int polls = 0; running(); ++polls) {
        if (polls >= kMaxRunPolls || !WaitWatch::KeepWaiting())
            return false;
        Clock::Sleep(delay);
        if (growing)
            delay = qMin(delay + kRunDelayStepMs, kMaxRunDelayMs);
    }
    return true;
}

bool FetchDeviceFile(IKestoDevice *device, const QString &devicePath, QByteArray &content)
{
    content.clear();
    if (!device)
        return false;
    // A private scratch file per look: runs on several handsets at once must
    // never read each other's copies.
    QTemporaryFile scratch(QDir::tempPath() + QStringLiteral("/foobar_XXXXXX.txt"));
    if (!scratch.open())
        return false;
    const QString scratchPath = scratch.fileName();
    scratch.close();
    if (device->CopyFileFromDevice(devicePath, scratchPath) != 0)
        return false;
    Clock::Sleep(kSettleMs);
    QFile copy(scratchPath);
    if (!copy.open(QIODevice::ReadOnly))
        return false;
    content = copy.readAll();
    return true;
}

bool WaitForLogMarker(IKestoDevice *device, const QString &devicePath, const QByteArray &marker, Log *logger,
                      WaitProgress progress)
{
    qint64 delay = kFirstLogDelayMs;
    qint64 waited = 0;
    qsizetype largest = 0;
    int marks = 0;
    for (;;) {
        Clock::Sleep(delay);
        waited += delay;
        delay = delay < kMaxLogDelayMs ? delay + kLogDelayStepMs : kMaxLogDelayMs;

        QByteArray content;
        if (FetchDeviceFile(device, devicePath, content)) {
            if (content.contains(marker))
                return true;
            const bool grown = content.size() > largest;
            if (grown)
                largest = content.size();
            if (logger && progress != WaitProgress::None && (grown || progress == WaitProgress::DotsAndDashes)) {
                const bool newLine = ++marks % kMarksPerLine == 0;
                if (grown)
                    logger->EchoDot(newLine, kProgressIndent);
                else
                    logger->EchoDash(newLine, kProgressIndent);
            }
        }
        // A handset that went away will never complete the log.
        if (waited > kLogWaitLimitMs || (device && device->connectionLost) || !WaitWatch::KeepWaiting())
            return false;
    }
}

namespace {
thread_local WaitWatch *t_watch = nullptr;
} // namespace

WaitWatch::WaitWatch(std::function<bool()> keepWaiting) : m_keepWaiting(std::move(keepWaiting)), m_outer(t_watch)
{
    t_watch = this;
}

WaitWatch::~WaitWatch()
{
    t_watch = m_outer;
}

bool WaitWatch::KeepWaiting()
{
    return !t_watch || !t_watch->m_keepWaiting || t_watch->m_keepWaiting();
}

} // namespace ModuleUtil
