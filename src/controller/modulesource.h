#pragma once

#include "../catalogue/testresults.h"
#include "../common/export.h"

#include <QDateTime>
#include <QSharedPointer>
#include <QString>
#include <QStringList>

class _TestModule;

// Hands the run loop of a Harness its modules one at a time
// (Harness::Run(ModuleSource &)). The loop asks for the next module whenever
// it is free, and tells the source how every module it took ended.
class HARNESS_EXPORT ModuleSource
{
public:
    // How a module taken by the run loop ended.
    enum Outcome {
        Recorded, // its logs were copied, post-processed and recorded
        NoLogs, // it ran but no logs were found
        StartFailed, // it could not be installed or started
        NoFramework, // the kit has no framework for its test type
        Interrupted, // the handset was lost before its logs were copied
        TimedOut, // it outlived the run's time limit per module and was removed
    };

    virtual ~ModuleSource();

    // The next module to run; null ends the run. Called on the run loop's
    // thread; it may block until a module is ready.
    virtual QSharedPointer<_TestModule> Next() = 0;
    // Told once for every module Next() handed out.
    virtual void Finished(const QSharedPointer<_TestModule> &module, Outcome outcome);
    // False (the default): a framework the run loaded is unloaded as soon as
    // a module of another test type comes, which suits modules sorted by
    // test type. True: every framework the run loaded stays on the handset
    // until the run ends, for sources whose test types come in any order.
    virtual bool KeepFrameworks() const;
};

// What one run loop saw of one module it took: where and when it ran, how it
// ended, and the verdicts its logs gave in this run.
struct HARNESS_EXPORT ModuleRecord
{
    QString name; // the module's name
    QString source; // "KVK" or "PVS"
    QString testType; // the module's test type word
    QString handset; // the connected handset's name
    QDateTime start; // UTC, when the loop took the module
    qint64 durationMs = 0; // until the outcome was known, on the library's clock
    qint64 timeLimitMs = 0; // the time limit it outlived (TimedOut)
    // How it ended; Interrupted until the outcome is known.
    ModuleSource::Outcome outcome = ModuleSource::Interrupted;
    bool parsed = false; // a log was recognised; results holds its verdicts
    // The verdicts the module's logs gave when they were recorded; empty
    // unless outcome is Recorded and a log was recognised.
    TestResults results;
    QStringList logs; // host paths of the logs copied in this run

    // Why the module did not run or finish, in a few words; empty when it
    // was recorded with verdicts.
    QString Reason() const;
};

// Told about every module a run loop takes (Harness::SetRunObserver): when
// it starts, while it waits, and as soon as its outcome is known. Called on
// the run loop's thread.
class HARNESS_EXPORT RunObserver
{
public:
    virtual ~RunObserver();
    // The loop took the module (name, source, test type, handset, start).
    virtual void ModuleStarted(const ModuleRecord &record);
    // After every poll of a wait of the module in hand: what it waits for
    // ("its start", "its log") and the milliseconds since it started, on the
    // library's clock.
    virtual void ModuleWaiting(const ModuleRecord &record, const QString &waitingFor, qint64 elapsedMs);
    // The module's outcome is known: the record now holds it, the duration,
    // the copied logs and, when recorded, the verdicts.
    virtual void ModuleEnded(const ModuleRecord &record) = 0;
};
