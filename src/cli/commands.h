#pragma once

#include <QString>
#include <QStringList>

#include <functional>

// Exit statuses of the tool.
enum ExitStatus {
    ExitSuccess = 0,
    ExitTestFailed = 1, // a test case failed or a module could not run
    ExitUsage = 2, // bad usage or a set-up failure (no kit, no handset, ...)
    ExitInterrupted = 130, // a run stopped by SIGINT or SIGTERM
};

// One sub-command: its name, a one-line summary and its entry point, which
// receives the arguments after the sub-command's name (argument 0 is
// "harness <name>" for the usage text).
struct Command
{
    const char *name;
    const char *summary;
    std::function<int(const QStringList &)> run;
};

// The commands each part of the tool contributes.
QList<Command> InspectionCommands();
QList<Command> ListingCommands();
QList<Command> ModuleCommands();
QList<Command> RunCommands();
QList<Command> ProcessCommands();
QList<Command> ReportCommands();
QList<Command> DemoCommands();

// Writes to standard output / standard error as UTF-8.
void Out(const QString &text);
void Err(const QString &text);

// One line "command: message" on standard error; false, or ExitUsage.
bool Fail(const QString &command, const QString &message);
int Refuse(const QString &command, const QString &message);
