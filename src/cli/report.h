#pragma once

#include <QCommandLineOption>
#include <QCommandLineParser>
#include <QDateTime>
#include <QHash>
#include <QList>
#include <QString>
#include <QStringList>

#include <functional>

// One test case of a module report.
struct TestCaseReport
{
    QString name;
    QString result; // "pass", "fail", "unsupported", "unexecuted" or the log's own word
    QString detail; // for a failure: the log's lines that give the verdict, when found
    qint64 timeMs = -1; // as the log gives it; -1 when it gives none
};

// One module of a report: where and when it ran, how it ended and its
// verdicts. Read from a processed-results file (the history view) only the
// catalogue fields, the handset and the verdicts are known.
struct ModuleReport
{
    QString name;
    QString family;
    QString subFamily;
    QString source;
    QString host; // the computer that drove the run
    QString handset; // the handset that ran it, when known
    QDateTime start; // UTC; invalid when unknown
    qint64 durationMs = -1; // -1 when unknown
    // Why the module did not run or did not finish ("handset lost",
    // "interrupted before it ran", ...); empty when it ran to its verdicts.
    QString reason;
    QStringList logs; // host paths of the logs copied for it
    QList<TestCaseReport> testCases;

    int Count(const QString &result) const;
    bool Executed() const; // any test case with a verdict other than "unexecuted"
    bool Finished() const { return reason.isEmpty(); }
};

// A report: one run as it happened (run), or the verdicts a processed-results
// file has gathered over time (report).
struct RunReport
{
    QString host; // the computer that drove the run
    QDateTime start; // UTC; invalid for the history view
    qint64 durationMs = -1;
    QStringList handsets;
    bool interrupted = false; // stopped by a signal
    QList<ModuleReport> modules;

    // Reads a processed-results file ("testmodules" / "module" / "testcase").
    // Returns false with a reason when the file cannot be read or parsed.
    bool Read(const QString &path, QString *error);

    // The summary table: one row per module (passed, failed, unsupported,
    // unexecuted), then the totals; below it, why modules did not finish.
    QString Summary(bool withHandset) const;

    // JUnit XML: one testsuite per module, one testcase per test case. "fail"
    // is a failure; every test case of a module that did not run or finish
    // is an error with the reason; other words are skipped.
    QByteArray JUnit() const;
    QByteArray Json() const;
    // A self-contained HTML page; links to logs are relative to folder (the
    // page's own folder).
    QByteArray Html(const QString &folder) const;

    int Total(const QString &result) const;
    int Errors() const; // test cases of modules that did not finish
    int NotFinished() const;

    // Drops the modules without any executed test case.
    void DropNotExecuted();
};

// The lines of a copied log that give a test case's verdict word: the first
// line naming the test case and the line with the word (the same line, or one
// of the few after it), joined by " / ". Empty when the log does not show it.
QString VerdictLines(const QString &logPath, const QString &testCase, const QString &verdict);

// The times a log's result table gives its test cases ("NAME VERDICT 12 ms"
// or "... 1.5 s"), in milliseconds by test case name.
QHash<QString, qint64> CaseTimes(const QString &logPath);

// A duration as people read it: "4.2 s", "95 s" from ten seconds on;
// empty when unknown (negative).
QString DurationText(qint64 ms);

// The --junit FILE, --json FILE and --html FILE options of the commands that
// report.
const QCommandLineOption &JUnitOption();
const QCommandLineOption &JsonOption();
const QCommandLineOption &HtmlOption();

// True when path ("-" is standard output) can be written: an existing file
// that is writable, or a new file in an existing writable folder. Else false
// with the reason.
bool CheckOutputPath(const QString &path, QString *error);
// Checks the export paths the parser names; false after one line on
// standard error.
bool CheckReportOutputs(const QCommandLineParser &parser, const QString &command);

// Prints the summary (on standard error when an export goes to standard
// output) and writes the exports the parser's options ask for. ExitUsage
// (with the reason on standard error) when an export cannot be written, else
// ExitSuccess.
// trailer, when given, adds lines after the summary.
int PublishReport(const RunReport &report, const QCommandLineParser &parser, bool withHandset,
                  const std::function<QString()> &trailer = {});
// True when an export option names standard output ("-").
bool ExportsToOutput(const QCommandLineParser &parser);
