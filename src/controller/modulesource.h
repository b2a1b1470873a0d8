#pragma once

#include "common/export.h"

#include <QSharedPointer>

class _TestModule;

// Hands the run loop of a Harness its modules one at a time
// (Harness::Run(ModuleSource &)). The loop asks for the next module whenever
// it is free, and tells the source how every module it took ended.
class HARNESS_EXPORT ModuleSource
{
public:
    // How a module taken by the run loop ended.
    enum Outcome {
        Recorded,      // its logs were copied, post-processed and recorded
        NoLogs,        // it ran but no logs were found
        StartFailed,   // it could not be started
        NoFramework,   // the kit has no framework for its test type
        Interrupted,   // the handset was lost before its logs were copied
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
