#pragma once

#include <QCommandLineOption>
#include <QCommandLineParser>
#include <QList>
#include <QString>

// Verdicts of one module as a processed-results file records them.
struct ModuleReport
{
    QString name;
    QString family;
    QString subFamily;
    QString source;
    QString handset;  // the handset that ran it, when known
    QList<QPair<QString, QString>> testCases;  // (name, result word)

    int Count(const QString &result) const;
    bool Executed() const;  // any test case with a verdict other than "unexecuted"
};

struct RunReport
{
    QList<ModuleReport> modules;

    // Reads a processed-results file ("testmodules" / "module" / "testcase").
    // Returns false with a reason when the file cannot be read or parsed.
    bool Read(const QString &path, QString *error);

    // The summary table: one row per module (passed, failed, unsupported,
    // unexecuted), then the totals.
    QString Summary(bool withHandset) const;

    // JUnit XML: one testsuite per module, one testcase per test case; "fail"
    // becomes a failure, "unsupported" and "unexecuted" are skipped with the
    // word as message.
    bool WriteJUnit(const QString &path, QString *error) const;

    // A JSON summary of the same data.
    bool WriteJson(const QString &path, QString *error) const;

    int Total(const QString &result) const;

    // Drops the modules without any executed test case.
    void DropNotExecuted();
};

// The --junit FILE and --json FILE options of the commands that report.
const QCommandLineOption &JUnitOption();
const QCommandLineOption &JsonOption();

// Prints the summary and writes the exports the parser's options ask for.
// ExitUsage (with the reason on standard error) when an export cannot be
// written, else ExitSuccess.
int PublishReport(const RunReport &report, const QCommandLineParser &parser, bool withHandset);
