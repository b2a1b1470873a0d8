// The run loop: frameworks, modules, log waits, copies and results.

#include "controller/harness.h"

#include "catalogue/framework.h"
#include "catalogue/manifest.h"
#include "catalogue/testmodule.h"
#include "common/clock.h"
#include "controller/modulesource.h"
#include "controller/resultssession.h"
#include "modules/moduleutil.h"

#include <algorithm>

namespace {

// How long a module may take to complete its log.
constexpr qint64 kLogWaitLimitMs = 600000;
// Polling interval for handsets of the host-simulator kind, and for others.
constexpr qint64 kFastPollMs = 250;
constexpr qint64 kPollMs = 1000;

const QString kConnectionDied = QStringLiteral("Device Connection has died.");

bool RunsBefore(const QSharedPointer<_TestModule> &a, const QSharedPointer<_TestModule> &b)
{
    const QString typeA = a->TestType();
    const QString typeB = b->TestType();
    if (typeA != typeB)
        return typeA < typeB;
    return a->moduleName < b->moduleName;
}

} // namespace

void Harness::AddTest(QSharedPointer<_TestModule> module)
{
    if (module)
        m_tests.append(module);
}

bool Harness::WaitForLog(QSharedPointer<_TestModule> module)
{
    const Clock::Timer timer;
    for (;;) {
        if (ConnectionDied())
            return false;
        if (timer.Elapsed() > kLogWaitLimitMs || !ModuleUtil::WaitWatch::KeepWaiting()
            || module->IsLogComplete(m_device))
            return true;
        Clock::Sleep(m_device->platform == IKestoDevice::PLATFORM_WIN32 ? kFastPollMs : kPollMs);
    }
}

namespace {

// The modules of a list in order.
class ListSource : public ModuleSource
{
public:
    explicit ListSource(const QList<QSharedPointer<_TestModule>> &modules) : m_modules(modules) { }
    QSharedPointer<_TestModule> Next() override
    {
        return m_next < m_modules.size() ? m_modules.at(m_next++) : QSharedPointer<_TestModule>();
    }

private:
    QList<QSharedPointer<_TestModule>> m_modules;
    qsizetype m_next = 0;
};

// A framework on the handset during a run, and whether the run found it there.
struct RunFramework
{
    QSharedPointer<_Framework> framework;
    bool wasLoaded = false;
};

} // namespace

ModuleSource::~ModuleSource() = default;

RunObserver::~RunObserver() = default;

QString ModuleRecord::Reason() const
{
    switch (outcome) {
    case ModuleSource::Recorded:
        return parsed ? QString() : QStringLiteral("no log was recognised");
    case ModuleSource::NoLogs:
        return QStringLiteral("no log was found");
    case ModuleSource::StartFailed:
        return QStringLiteral("install or start failed");
    case ModuleSource::NoFramework:
        return QStringLiteral("no framework for test type %1").arg(testType);
    case ModuleSource::TimedOut:
        return QStringLiteral("stopped after its time limit of %1 s").arg(double(timeLimitMs) / 1000.0);
    case ModuleSource::Interrupted:
        break;
    }
    return QStringLiteral("handset lost");
}

void RunObserver::ModuleStarted(const ModuleRecord &)
{
}

void RunObserver::ModuleWaiting(const ModuleRecord &, const QString &, qint64)
{
}

void ModuleSource::Finished(const QSharedPointer<_TestModule> &, Outcome)
{
}

bool ModuleSource::KeepFrameworks() const
{
    return false;
}

void Harness::SortForRun(QList<QSharedPointer<_TestModule>> &modules)
{
    std::stable_sort(modules.begin(), modules.end(), RunsBefore);
}

bool Harness::Run()
{
    if (m_tests.isEmpty()) {
        LogMessage(QStringLiteral("No modules to run."), true);
        return false;
    }
    if (!Setup())
        return false;
    if (!ConnectToTarget(m_target) || !m_device)
        return false;

    QList<QSharedPointer<_TestModule>> order = m_tests;
    SortForRun(order);
    ListSource source(order);
    return RunModules(source);
}

bool Harness::Run(ModuleSource &source)
{
    if (!Setup())
        return false;
    if (!ConnectToTarget(m_target) || !m_device)
        return false;
    return RunModules(source);
}

bool Harness::RunModules(ModuleSource &source)
{
    const ResultsSession session(*this, false);
    const bool keepFrameworks = source.KeepFrameworks();
    // The frameworks on the handset for this run, in load order; the current
    // one (the last module's) is at `current`, -1 when there is none.
    QList<RunFramework> frameworks;
    qsizetype current = -1;
    bool result = false;

    const auto unload = [this](const RunFramework &entry) {
        if (entry.wasLoaded)
            return;
        LogMessage(QStringLiteral("Unloading Framework %1\n").arg(entry.framework->name), true);
        entry.framework->Unload(m_device, m_environment);
    };

    ModuleRecord record;
    Clock::Timer moduleTimer;
    // While a module is in hand: what it waits for, and whether it has
    // outlived the time limit.
    bool inHand = false;
    QString waitingFor;
    bool timedOut = false;
    const ModuleUtil::WaitWatch watch([&] {
        if (!inHand)
            return true;
        const qint64 elapsed = moduleTimer.Elapsed();
        if (m_observer)
            m_observer->ModuleWaiting(record, waitingFor, elapsed);
        if (m_moduleTimeLimitMs > 0 && elapsed > m_moduleTimeLimitMs)
            timedOut = true;
        return !timedOut;
    });
    // Tells the source and the observer how the module in hand ended.
    const auto finish = [&](const QSharedPointer<_TestModule> &module, ModuleSource::Outcome outcome) {
        inHand = false;
        record.outcome = outcome;
        record.durationMs = moduleTimer.Elapsed();
        if (m_observer)
            m_observer->ModuleEnded(record);
        source.Finished(module, outcome);
    };
    // A module past the time limit is no longer waited for and leaves the
    // handset; true when the handset is still there for the next one.
    const auto stopTimedOut = [&](const QSharedPointer<_TestModule> &module) {
        LogMessage(QStringLiteral("   Test %1 did not finish within %2 s; stopping it\n")
                       .arg(module->moduleName)
                       .arg(double(m_moduleTimeLimitMs) / 1000.0),
                   true);
        if (!m_noDelete && !m_device->connectionLost) {
            module->RemoveTest(m_device);
            LogMessage(QStringLiteral("   Removing test %1\n").arg(module->moduleName), true);
        }
        record.timeLimitMs = m_moduleTimeLimitMs;
        finish(module, m_device->connectionLost ? ModuleSource::Interrupted : ModuleSource::TimedOut);
        return !ConnectionDied();
    };

    while (const QSharedPointer<_TestModule> module = source.Next()) {
        record = ModuleRecord();
        record.name = module->moduleName;
        record.source = module->Source();
        record.testType = module->TestType();
        record.handset = m_device->GetConnectTarget().name;
        record.start = QDateTime::currentDateTimeUtc();
        moduleTimer.Restart();
        inHand = true;
        timedOut = false;
        waitingFor = QStringLiteral("its framework");
        if (m_observer)
            m_observer->ModuleStarted(record);
        module->SetLogger(m_logger);
        const QString name = module->moduleName;
        const QString testType = module->TestType();

        if (current < 0 || testType != frameworks.at(current).framework->name) {
            if (current >= 0 && !keepFrameworks) {
                unload(frameworks.at(current));
                frameworks.removeAt(current);
            }
            current = -1;
            for (qsizetype i = 0; i < frameworks.size(); ++i) {
                if (frameworks.at(i).framework->name.toLower() == testType.toLower())
                    current = i;
            }
        }
        if (current < 0) {
            RunFramework entry;
            entry.framework = GetFramework(testType);
            if (!entry.framework) {
                LogMessage(QStringLiteral("Framework %1 not found.\n").arg(testType), true);
                result = true;
                finish(module, ModuleSource::NoFramework);
                continue;
            }
            entry.framework->SetLogger(m_logger);
            if (entry.framework->IsLoaded(m_device)) {
                entry.framework->PostLoad(m_device, m_environment);
                LogMessage(QStringLiteral("Harness::Run Framework %1 already loaded").arg(entry.framework->name),
                           false);
                entry.wasLoaded = true;
            } else {
                LogMessage(QStringLiteral("Loading Framework %1\n").arg(entry.framework->name), true);
                entry.framework->Load(m_device, m_environment);
            }
            frameworks.append(entry);
            current = frameworks.size() - 1;
        }

        LogMessage(QStringLiteral("Running %1 test %2 ID:%3\n").arg(module->Source(), name, module->ModuleName()),
                   true);
        if (!m_testCases.isEmpty()) {
            module->SetTestCases(m_testCases);
            m_testCases.clear();
        }
        module->SetRunOption(m_runOption);

        result = true;
        waitingFor = QStringLiteral("its start");
        if (!Run(module)) {
            if (timedOut) {
                if (!stopTimedOut(module))
                    return false;
                continue;
            }
            LogMessage(QStringLiteral("Test %1 Failed\n").arg(name), true);
            // A handset that went away fails every module after this one.
            if (m_device->connectionLost) {
                finish(module, ModuleSource::Interrupted);
                ConnectionDied();
                return false;
            }
            finish(module, ModuleSource::StartFailed);
            continue;
        }

        LogMessage(QStringLiteral("   Test %1 Run\n").arg(name), true);
        waitingFor = QStringLiteral("its log");
        if (!WaitForLog(module)) {
            finish(module, ModuleSource::Interrupted);
            return false;
        }
        if (timedOut) {
            if (!stopTimedOut(module))
                return false;
            continue;
        }
        waitingFor = QStringLiteral("its logs to be copied");

        if (m_copyDelay > 0) {
            LogMessage(QStringLiteral("   Sleeping %1 Milliseconds\n").arg(m_copyDelay), true);
            Clock::Sleep(m_copyDelay);
        }
        if (!module->CopyLog(m_device, m_environment)) {
            LogMessage(QStringLiteral("   No logs found for %1\n").arg(name), true);
            // Logs that could not be fetched from a handset that went away
            // are not the module's fault: it has to run again elsewhere.
            finish(module, m_device->connectionLost ? ModuleSource::Interrupted : ModuleSource::NoLogs);
            if (ConnectionDied())
                return false;
            continue;
        }
        if (!m_noDelete) {
            module->RemoveTest(m_device);
            LogMessage(QStringLiteral("   Removing test %1\n").arg(name), true);
        }
        module->PostProcess(m_environment);
        record.logs = module->desktopLogFiles;
        // The copied logs are recorded even when the handset went away while
        // the module was being removed.
        record.parsed = RecordVerdicts(module, record.results);
        finish(module, ModuleSource::Recorded);
        if (ConnectionDied())
            return false;
    }

    for (const RunFramework &entry : frameworks)
        unload(entry);
    if (ConnectionDied())
        return false;
    return result;
}

bool Harness::ConnectionDied()
{
    if (!m_device || !m_device->connectionLost)
        return false;
    LogMessage(kConnectionDied, true);
    return true;
}

bool Harness::Run(QSharedPointer<_TestModule> module)
{
    if (!Setup() || !module || !ConnectToTarget(m_target) || !m_device)
        return false;

    bool first = true;
    for (const QString &secondaryName : module->secondaryModules) {
        if (first) {
            LogMessage(QStringLiteral("Loading Secondary Modules\n"), true);
            first = false;
        }
        bool found = false;
        const struct
        {
            QSharedPointer<Manifest> catalogue;
            const char *message;
        } catalogues[] = {
            {m_kitManifest, "   Loading Secondary Module from KVK: %1\n"},
            {m_platformManifest, "   Loading Secondary Module from PVS: %1\n"},
        };
        for (const auto &entry : catalogues) {
            if (!entry.catalogue)
                continue;
            const QSharedPointer<_TestModule> secondary = entry.catalogue->FindTestModule(secondaryName);
            if (!secondary)
                continue;
            found = true;
            LogMessage(QString::fromLatin1(entry.message).arg(secondaryName), true);
            secondary->SetLogger(m_logger);
            secondary->InstallTest(m_device);
        }
        if (!found) {
            LogMessage(QStringLiteral("   Warning: Secondary Module %1 not found.\n").arg(secondaryName), true);
        }
    }
    return module->Run(m_device, m_environment);
}

bool Harness::Run(const QString &name)
{
    if (!Setup() || !m_kitManifest)
        return false;
    const QSharedPointer<_TestModule> module = m_kitManifest->FindTestModule(name);
    return module ? Run(module) : false;
}

bool Harness::Load(QSharedPointer<_Framework> framework)
{
    if (!framework || !Setup())
        return false;
    if (!ConnectToTarget(m_target)) {
        LogMessage(QStringLiteral("Load Error: A device is not available.\n"), true);
        return false;
    }
    if (!m_device)
        return false;
    framework->SetLogger(m_logger);
    if (framework->Load(m_device, m_environment))
        return true;
    if (!m_device->connectionLost) {
        LogMessage(QStringLiteral("Load Error: Kestix framework package for %1 not found.\n")
                       .arg(IKestoDevice::TargetToString(m_device->platform)),
                   true);
    }
    return false;
}

bool Harness::Load(const QString &name)
{
    if (!Setup() || !m_kitManifest)
        return false;
    QList<QSharedPointer<_Framework>> frameworks;
    m_kitManifest->GetFrameworks(frameworks);
    for (const QSharedPointer<_Framework> &framework : frameworks) {
        if (framework->name == name)
            return Load(framework);
    }
    return false;
}

bool Harness::Unload(QSharedPointer<_Framework> framework)
{
    if (!framework || !Setup() || !ConnectToTarget(m_target) || !m_device)
        return false;
    framework->SetLogger(m_logger);
    framework->Unload(m_device, m_environment);
    return true;
}

bool Harness::Unload()
{
    QList<QSharedPointer<_Framework>> frameworks;
    ListFrameworks(frameworks);
    bool unloaded = false;
    for (const QSharedPointer<_Framework> &framework : frameworks) {
        if (Unload(framework))
            unloaded = true;
    }
    return unloaded;
}

QSharedPointer<_Framework> Harness::GetFramework(const QString &name)
{
    if (!Setup() || !m_kitManifest)
        return {};
    QList<QSharedPointer<_Framework>> frameworks;
    m_kitManifest->GetFrameworks(frameworks);
    const QString wanted = name.toLower();
    for (const QSharedPointer<_Framework> &framework : frameworks) {
        if (framework->name.toLower() == wanted)
            return framework;
    }
    return {};
}

unsigned int Harness::ListFrameworks(QList<QSharedPointer<_Framework>> &frameworks)
{
    frameworks.clear();
    if (Setup() && m_kitManifest)
        m_kitManifest->GetFrameworks(frameworks);
    return unsigned(frameworks.size());
}
