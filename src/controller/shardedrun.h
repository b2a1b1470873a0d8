#pragma once

#include "../common/export.h"
#include "modulesource.h"

#include <QDateTime>
#include <QList>
#include <QSharedPointer>
#include <QString>
#include <QStringList>

#include <atomic>

class Harness;
class Log;
class RunObserver;
class _TestModule;

// Runs one selection of modules on several handsets at once. The selected
// modules form one queue in run order; one worker thread per handset, each
// with its own Harness (its own connection, catalogues, frameworks, log
// folder and processed-results file), takes the next module whenever it is
// free. A module runs on exactly one handset. A Harness whose target is
// exactly the name of a listed handset connects to that handset only. A handset that is lost stops
// taking work: the module it had in hand goes back to the front of the queue
// for the others. When every handset is gone, the modules left are reported
// as not run.
//
//     ShardedRun run(&log);
//     for (Harness *harness : harnesses)   // configured, each with its own target
//         run.AddHandset(harness);
//     run.Run(selection);                  // selection from any Harness
//     for (const ShardedRun::ModuleResult &m : run.Modules()) ...
//
// Each worker uses only its own Harness and the modules of that Harness's
// catalogues, looked up by name and source before the workers start; the
// selection's own module objects are read on the calling thread only.
class HARNESS_EXPORT ShardedRun
{
public:
    // What happened to one module of the selection.
    struct ModuleResult
    {
        // The module's name.
        QString name;
        QString source; // "KVK" or "PVS"
        // The module's test type word.
        QString testType;
        QString handset; // the handset that ran it; empty when none did
        bool ran = false; // a handset took it and it ended (any outcome)
        // How it ended; Interrupted when no handset finished it.
        ModuleSource::Outcome outcome = ModuleSource::Interrupted;
        int attempts = 0; // how many handsets took it
        // What the last handset that took it saw: start, duration, copied
        // logs and the verdicts recorded in this run. Empty when no handset
        // took it.
        ModuleRecord record;
    };

    // One handset of the run.
    struct HandsetResult
    {
        QString target; // the Harness's target setting
        QString handset; // the connected handset's name (the target when none)
        // The handset connected when the run began.
        bool connected = false;
        bool lost = false; // dropped out before the queue was done
        QDateTime lostAt; // when it dropped out (local time)
        qint64 lostAfterMs = 0; // milliseconds after the run began
        // How many modules it finished.
        int modulesRun = 0;
    };

    // Run-level messages (handsets joining and dropping out) go to logger.
    explicit ShardedRun(Log *logger = nullptr);
    ~ShardedRun();
    ShardedRun(const ShardedRun &) = delete;
    ShardedRun &operator=(const ShardedRun &) = delete;

    // A configured Harness with its target set; not owned. During Run it is
    // used by its worker thread only, which connects it and, when its share
    // of the run is over, disconnects it again. Each needs a log folder of
    // its own (the handset's default one, or its own SetLogOutputPath).
    void AddHandset(Harness *harness);
    // Test cases for the first module in run order, wherever it runs.
    void SetTestCases(const QStringList &testCases);
    // Told about every module each handset takes, on that handset's thread
    // (so from several threads at once); not owned, null for none. A module
    // that ends Interrupted goes back to the queue and is told about again
    // when another handset takes it.
    void SetObserver(RunObserver *observer);

    // Runs the selection (duplicates by name and source run once). Every
    // Harness is set up on the calling thread first, so a missing catalogue
    // cache is generated once. True when every module ran; false when no
    // handset was given, the selection was empty, or modules were left when
    // every handset was gone (NotRun()).
    bool Run(const QList<QSharedPointer<_TestModule>> &selection);

    // Makes the run stop taking modules: each handset finishes the module
    // in hand (removed from the handset, its logs recorded), unloads its
    // frameworks and ends; the modules not taken are left not run. Only
    // sets a flag, so it may be called from any thread or a signal handler.
    void Stop();
    // True once Stop has been called.
    bool Stopped() const;

    // Per module, in run order.
    QList<ModuleResult> Modules() const;
    // Per handset, in the order they were added.
    QList<HandsetResult> Handsets() const;
    // The names of the modules no handset completed, in run order.
    QStringList NotRun() const;

private:
    class Queue;
    class Worker;

    void LogMessage(const QString &message) const;

    std::atomic<bool> m_stop{false};

    Log *m_logger = nullptr;
    RunObserver *m_observer = nullptr;
    QList<Harness *> m_harnesses;
    QStringList m_testCases;
    QList<ModuleResult> m_modules;
    QList<HandsetResult> m_handsets;
};
