#pragma once

#include "../controller/modulesource.h"

#include <QHash>
#include <QMap>
#include <QString>

#include <cstdio>
#include <iostream>
#include <mutex>
#include <streambuf>
#include <string>

// The console of a run: one line per module as it ends,
//
//     [12/48] demo-phone  ITimer  3 passed 1 failed 1 unsupported  4.2 s
//
// with the verdicts coloured on a terminal (never with NO_COLOR set). While
// a module runs longer than a few seconds, a terminal shows a status line
// updated in place (module, handset, what it waits for, elapsed); any other
// output gets a heartbeat line every minute instead. Times are the library
// clock's, as the run loop reports them, so at KESTIX_TIME_SCALE=0 a long
// wait shows its heartbeats at once. Told from every handset's thread.
class ProgressPrinter : public RunObserver
{
public:
    // total: the modules of the run; the widths align the columns.
    ProgressPrinter(std::FILE *stream, int total, int handsetWidth, int moduleWidth);

    // Whether stream is a terminal, and whether it gets colour (a terminal
    // and NO_COLOR unset or empty).
    static bool IsTerminal(std::FILE *stream);
    static bool ColourWanted(std::FILE *stream);

    void ModuleStarted(const ModuleRecord &record) override;
    void ModuleWaiting(const ModuleRecord &record, const QString &waitingFor, qint64 elapsedMs) override;
    void ModuleEnded(const ModuleRecord &record) override;

    // A line of someone else's (a library warning) for stream, printed
    // without tearing the status line.
    void Message(std::FILE *stream, const QString &line);
    // Clears the status line; call before printing after the run.
    void Finish();

private:
    QString Paint(const QString &text, const char *colour) const;
    QString Columns(const QString &count, const QString &handset, const QString &module) const;
    void Write(std::FILE *stream, const QString &text);
    void ClearStatus();
    void DrawStatus();

    std::mutex m_mutex;
    std::FILE *m_stream;
    bool m_terminal;
    bool m_colour;
    int m_total;
    int m_done = 0;
    int m_handsetWidth;
    int m_moduleWidth;
    // Per handset: the status text of its module in hand, and how many
    // heartbeats that module has had.
    QMap<QString, QString> m_status;
    QHash<QString, qint64> m_beats;
    QString m_statusShown;
};

// The library's console echo during a run: while alive it is std::cout's
// buffer (the library echoes there). It passes whole lines, blank ones
// dropped: with verbose every line, else only warnings and errors. Lines go
// to standard error, through the printer once there is one.
class ConsoleFilter : public std::streambuf
{
public:
    explicit ConsoleFilter(bool verbose);
    ~ConsoleFilter() override;
    ConsoleFilter(const ConsoleFilter &) = delete;
    ConsoleFilter &operator=(const ConsoleFilter &) = delete;

    // Set before the run's threads start; null for none.
    void SetPrinter(ProgressPrinter *printer);

protected:
    int overflow(int c) override;

private:
    void Flush();

    ProgressPrinter *m_printer = nullptr;
    bool m_verbose;
    std::string m_line;
    std::streambuf *m_saved;
};
