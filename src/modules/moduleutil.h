#pragma once

// Helpers shared by the module kinds: log line classification, time-stamped
// host names, the waits on a running test and on a growing handset log.

#include "../common/export.h"

#include <QByteArray>
#include <QString>

#include <functional>

class IKestoDevice;
class Log;
struct TestResults;

namespace ModuleUtil {

// Polls a handset at most this often while waiting for a test to stop.
constexpr int kMaxRunPolls = 660000;
// Gives up on a handset log that never completes after this much waiting.
constexpr qint64 kLogWaitLimitMs = 600000;

// True when line starts with prefix, ignoring letter case.
HARNESS_EXPORT bool StartsWithNoCase(const QString &line, const QString &prefix);
// line with every occurrence of prefix removed (letter case ignored), trimmed.
HARNESS_EXPORT QString PrefixValue(const QString &line, const QString &prefix);
// True when text ends with suffix, ignoring letter case.
HARNESS_EXPORT bool EndsWithNoCase(const QString &text, const QString &suffix);

// fileName with every "." replaced by the local time "-yyyy-MM-dd-hh-mm-ss.".
HARNESS_EXPORT QString TimeStampedName(const QString &fileName);

// "%1(0x%2)": the handset's last error in decimal and in hexadecimal
// right-aligned in 8 blanks-padded characters.
HARNESS_EXPORT QString DeviceErrorText(unsigned int error);

// Clears what a parse fills afresh (manifest name and case results) and
// dates the results now, until the log states its own time.
HARNESS_EXPORT void StartParse(TestResults &results);
// Appends (testCase, result) once both are known, and clears both.
HARNESS_EXPORT void RecordPair(TestResults &results, QString &testCase, QString &result);

// Reads a text log line by line (line ends removed), whatever bytes it holds.
// False when the file cannot be opened.
HARNESS_EXPORT bool ForEachLogLine(const QString &path, const std::function<void(const QString &)> &handle);

// Waits while running() answers true, sleeping between polls: a delay that
// starts at 1 ms and grows by 50 ms up to 1000 ms (growing), or 1 ms each
// time. True when the test stopped within kMaxRunPolls polls (and its
// WaitWatch, if any, let it wait).
HARNESS_EXPORT bool WaitWhileRunning(const std::function<bool()> &running, bool growing);

// Copies a handset file to a private temporary host file, lets it settle
// 100 ms and reads it. False when the handset could not copy it.
HARNESS_EXPORT bool FetchDeviceFile(IKestoDevice *device, const QString &devicePath, QByteArray &content);

// How a log wait shows progress on the console.
enum class WaitProgress {
    None,
    Dots, // a dot whenever the log has grown
    DotsAndDashes, // a dot when it has grown, a dash when it has not
};

// Polls the handset log until it holds marker (letter case as given), with
// a delay from 100 ms growing by 100 ms up to 2000 ms. False once the delays
// add up to more than kLogWaitLimitMs without the marker, or when this
// thread's WaitWatch says to stop.
HARNESS_EXPORT bool WaitForLogMarker(IKestoDevice *device, const QString &devicePath, const QByteArray &marker,
                                     Log *logger, WaitProgress progress);

// Lets a caller watch the waits of its own thread: while a WaitWatch is
// alive, WaitWhileRunning and WaitForLogMarker call it after every poll, and
// give up (returning false) as soon as it answers false. Watches nest; the
// innermost one is asked.
class HARNESS_EXPORT WaitWatch
{
public:
    explicit WaitWatch(std::function<bool()> keepWaiting);
    ~WaitWatch();
    WaitWatch(const WaitWatch &) = delete;
    WaitWatch &operator=(const WaitWatch &) = delete;

    // What the innermost watch of this thread answers; true without one.
    static bool KeepWaiting();

private:
    std::function<bool()> m_keepWaiting;
    WaitWatch *m_outer;
};

} // namespace ModuleUtil
