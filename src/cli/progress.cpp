// The console of a run: progress lines, the status line and heartbeats, and
// the filter on the library's echo.

#include "cli/progress.h"

#include "cli/report.h"

#include <QRegularExpression>

#include <cstdlib>

#include <sys/ioctl.h>
#include <unistd.h>

namespace {

const char *const kGreen = "32";
const char *const kRed = "31";
const char *const kYellow = "33";
const char *const kClearLine = "\r\033[K";
// After how long a running module gets a status line, and how often a
// heartbeat line.
constexpr qint64 kStatusAfterMs = 3000;
constexpr qint64 kHeartbeatMs = 60000;

QString Elapsed(qint64 ms)
{
    const qint64 seconds = ms / 1000;
    if (seconds < 60)
        return QStringLiteral("%1 s").arg(seconds);
    return QStringLiteral("%1 min %2 s").arg(seconds / 60).arg(seconds % 60);
}

int TerminalWidth(std::FILE *stream)
{
    winsize size = {};
    if (ioctl(fileno(stream), TIOCGWINSZ, &size) == 0 && size.ws_col > 10)
        return size.ws_col;
    return 80;
}

} // namespace

ProgressPrinter::ProgressPrinter(std::FILE *stream, int total, int handsetWidth, int moduleWidth)
    : m_stream(stream), m_terminal(IsTerminal(stream)), m_colour(ColourWanted(stream)), m_total(total),
      m_handsetWidth(handsetWidth), m_moduleWidth(moduleWidth)
{
}

bool ProgressPrinter::IsTerminal(std::FILE *stream)
{
    return isatty(fileno(stream)) == 1;
}

bool ProgressPrinter::ColourWanted(std::FILE *stream)
{
    const char *noColour = std::getenv("NO_COLOR");
    return IsTerminal(stream) && !(noColour && *noColour);
}

QString ProgressPrinter::Paint(const QString &text, const char *colour) const
{
    if (!m_colour || !colour)
        return text;
    return QStringLiteral("\033[%1m%2\033[0m").arg(QLatin1String(colour), text);
}

QString ProgressPrinter::Columns(const QString &count, const QString &handset, const QString &module) const
{
    return count + QLatin1Char(' ') + handset.leftJustified(m_handsetWidth) + QStringLiteral("  ")
        + module.leftJustified(m_moduleWidth) + QStringLiteral("  ");
}

void ProgressPrinter::Write(std::FILE *stream, const QString &text)
{
    const QByteArray bytes = text.toUtf8();
    std::fwrite(bytes.constData(), 1, size_t(bytes.size()), stream);
    std::fflush(stream);
}

void ProgressPrinter::ClearStatus()
{
    if (m_statusShown.isEmpty())
        return;
    Write(m_stream, QString::fromLatin1(kClearLine));
    m_statusShown.clear();
}

void ProgressPrinter::DrawStatus()
{
    if (!m_terminal || m_status.isEmpty())
        return;
    QStringList parts;
    for (const QString &text : std::as_const(m_status))
        parts.append(text);
    QString line = parts.join(QStringLiteral("; "));
    const int width = TerminalWidth(m_stream) - 1;
    if (line.size() > width)
        line = line.left(width - 3) + QStringLiteral("...");
    if (line == m_statusShown)
        return;
    Write(m_stream, QString::fromLatin1(kClearLine) + line);
    m_statusShown = line;
}

void ProgressPrinter::ModuleStarted(const ModuleRecord &record)
{
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_beats.insert(record.handset, 0);
}

void ProgressPrinter::ModuleWaiting(const ModuleRecord &record, const QString &waitingFor, qint64 elapsedMs)
{
    const std::lock_guard<std::mutex> lock(m_mutex);
    if (elapsedMs < kStatusAfterMs)
        return;
    const QString what = QStringLiteral("waiting for %1, %2").arg(waitingFor, Elapsed(elapsedMs));
    if (m_terminal) {
        m_status.insert(record.handset, QStringLiteral("%1 on %2: %3").arg(record.name, record.handset, what));
        DrawStatus();
        return;
    }
    const qint64 beats = elapsedMs / kHeartbeatMs;
    if (beats <= m_beats.value(record.handset))
        return;
    m_beats.insert(record.handset, beats);
    Write(m_stream,
          Columns(QStringLiteral("[...]"), record.handset, record.name) + QStringLiteral("still running: ") + what
              + QLatin1Char('\n'));
}

void ProgressPrinter::ModuleEnded(const ModuleRecord &record)
{
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_status.remove(record.handset);
    m_beats.remove(record.handset);
    QString verdicts;
    if (record.outcome == ModuleSource::Interrupted) {
        // It goes back to the queue: not counted yet.
        verdicts = Paint(QStringLiteral("handset lost; the module goes back to the queue"), kYellow);
    } else {
        ++m_done;
        const QString reason = record.Reason();
        if (!reason.isEmpty()) {
            verdicts = Paint(QStringLiteral("not finished: ") + reason, kRed);
        } else {
            QMap<QString, int> counts;
            for (const TestCaseResult &verdict : record.results.caseResults)
                ++counts[verdict.result];
            const struct
            {
                const char *word;
                const char *shown;
                const char *colour;
            } known[] = {{"pass", "passed", kGreen}, {"fail", "failed", kRed}, {"unsupported", "unsupported", kYellow}};
            QStringList parts;
            for (const auto &entry : known) {
                const int count = counts.take(QLatin1String(entry.word));
                if (count > 0 || qstrcmp(entry.word, "pass") == 0)
                    parts.append(Paint(QStringLiteral("%1 %2").arg(count).arg(QLatin1String(entry.shown)),
                                       count > 0 ? entry.colour : nullptr));
            }
            for (auto it = counts.cbegin(); it != counts.cend(); ++it)
                parts.append(QStringLiteral("%1 %2").arg(it.value()).arg(it.key()));
            verdicts = parts.join(QLatin1Char(' '));
        }
    }
    const int digits = int(QString::number(m_total).size());
    const QString count = QStringLiteral("[%1/%2]").arg(m_done, digits).arg(m_total);
    ClearStatus();
    Write(m_stream,
          Columns(count, record.handset, record.name) + verdicts + QStringLiteral("  ")
              + DurationText(qMax<qint64>(record.durationMs, 0)) + QLatin1Char('\n'));
    DrawStatus();
}

void ProgressPrinter::Message(std::FILE *stream, const QString &line)
{
    const std::lock_guard<std::mutex> lock(m_mutex);
    ClearStatus();
    Write(stream, line + QLatin1Char('\n'));
    DrawStatus();
}

void ProgressPrinter::Finish()
{
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_status.clear();
    ClearStatus();
}

ConsoleFilter::ConsoleFilter(bool verbose) : m_verbose(verbose), m_saved(std::cout.rdbuf(this))
{
}

ConsoleFilter::~ConsoleFilter()
{
    Flush();
    std::cout.rdbuf(m_saved);
    std::cout.clear();
}

void ConsoleFilter::SetPrinter(ProgressPrinter *printer)
{
    m_printer = printer;
}

int ConsoleFilter::overflow(int c)
{
    if (c == traits_type::eof())
        return traits_type::not_eof(c);
    if (c == '\n')
        Flush();
    else
        m_line.push_back(char(c));
    return c;
}

void ConsoleFilter::Flush()
{
    static const QRegularExpression notable(QStringLiteral("\\b(warning|error)\\b"),
                                            QRegularExpression::CaseInsensitiveOption);
    const QString line = QString::fromUtf8(m_line.data(), qsizetype(m_line.size()));
    m_line.clear();
    if (line.trimmed().isEmpty() || (!m_verbose && !notable.match(line).hasMatch()))
        return;
    if (m_printer) {
        m_printer->Message(stderr, line);
    } else {
        const QByteArray bytes = line.toUtf8() + '\n';
        std::fwrite(bytes.constData(), 1, size_t(bytes.size()), stderr);
        std::fflush(stderr);
    }
}
