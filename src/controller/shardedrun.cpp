// One selection of modules shared by several handsets: a queue in run order
// and one worker thread per handset that takes the next module when free.

#include "controller/shardedrun.h"

#include "catalogue/testmodule.h"
#include "common/clock.h"
#include "controller/harness.h"
#include "controller/moduletimings.h"
#include "log/log.h"

#include <QHash>
#include <QSet>
#include <QSysInfo>

#include <condition_variable>
#include <deque>
#include <mutex>
#include <thread>

namespace {

QString ModuleCount(qsizetype count)
{
    return count == 1 ? QStringLiteral("1 module") : QStringLiteral("%1 modules").arg(count);
}

} // namespace

// The modules not yet taken, and what became of those that were. Shared by
// the workers; every member is guarded by the mutex.
class ShardedRun::Queue
{
public:
    Queue(QList<ModuleResult> &results, const std::atomic<bool> &stop) : m_results(results), m_stop(stop)
    {
        for (qsizetype i = 0; i < results.size(); ++i)
            m_pending.push_back(i);
    }

    // The index of the next module to run. Waits while the queue is empty
    // but modules are still in other handsets' hands (one of them may come
    // back); -1 once nothing is left to do.
    qsizetype Take()
    {
        std::unique_lock<std::mutex> lock(m_mutex);
        for (;;) {
            if (m_stop)
                return -1;
            if (!m_pending.empty()) {
                const qsizetype index = m_pending.front();
                m_pending.pop_front();
                ++m_inHand;
                ++m_results[index].attempts;
                return index;
            }
            if (m_inHand == 0)
                return -1;
            m_changed.wait(lock);
        }
    }

    // A module that was taken has ended on handset; an interrupted one goes
    // back to the front of the queue.
    void Done(qsizetype index, const QString &handset, ModuleSource::Outcome outcome, const ModuleRecord &record)
    {
        {
            const std::lock_guard<std::mutex> lock(m_mutex);
            --m_inHand;
            if (!record.name.isEmpty())
                m_results[index].record = record;
            if (outcome == ModuleSource::Interrupted) {
                m_pending.push_front(index);
            } else {
                ModuleResult &result = m_results[index];
                result.ran = true;
                result.handset = handset;
                result.outcome = outcome;
            }
        }
        m_changed.notify_all();
    }

    qsizetype Pending()
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return qsizetype(m_pending.size());
    }

private:
    std::mutex m_mutex;
    std::condition_variable m_changed;
    std::deque<qsizetype> m_pending;
    int m_inHand = 0;
    QList<ModuleResult> &m_results;
    const std::atomic<bool> &m_stop;
};

// One handset: its Harness runs the modules that it takes from the queue, in
// a thread of its own.
class ShardedRun::Worker : public ModuleSource, public RunObserver
{
public:
    Worker(ShardedRun &run, Queue &queue, Harness &harness, HandsetResult &result)
        : m_run(run), m_queue(queue), m_harness(harness), m_result(result)
    {
    }

    // The Harness's own module for each entry of the selection; called on
    // the calling thread before the workers start.
    void Prepare(const QList<ModuleResult> &modules)
    {
        for (qsizetype i = 0; i < modules.size(); ++i) {
            const QSharedPointer<_TestModule> module
                = m_harness.FindTestModule(modules.at(i).name, modules.at(i).source);
            if (module)
                m_modules.insert(i, module);
            m_names.append(modules.at(i).name);
        }
    }

    void Start(qsizetype testCasesFor, const QStringList &testCases)
    {
        m_testCasesFor = testCasesFor;
        m_testCases = testCases;
        m_thread = std::thread([this] { Work(); });
    }

    void Join()
    {
        if (m_thread.joinable())
            m_thread.join();
    }

    QSharedPointer<_TestModule> Next() override
    {
        for (;;) {
            const qsizetype index = m_queue.Take();
            if (index < 0) {
                m_exhausted = true;
                return {};
            }
            const QSharedPointer<_TestModule> module = m_modules.value(index);
            if (!module) {
                m_run.LogMessage(QStringLiteral("Module %1 is not in the catalogues of handset %2.\n")
                                     .arg(m_names.at(index), Name()));
                ModuleRecord record;
                record.name = m_names.at(index);
                record.handset = Name();
                record.start = QDateTime::currentDateTimeUtc();
                record.outcome = ModuleSource::StartFailed;
                if (m_run.m_observer)
                    m_run.m_observer->ModuleEnded(record);
                m_queue.Done(index, Name(), ModuleSource::StartFailed, record);
                continue;
            }
            m_current = index;
            if (index == m_testCasesFor && !m_testCases.isEmpty())
                module->SetTestCases(m_testCases);
            return module;
        }
    }

    void Finished(const QSharedPointer<_TestModule> &, Outcome outcome) override
    {
        if (m_current < 0)
            return;
        m_queue.Done(m_current, Name(), outcome, m_record);
        if (outcome != Interrupted)
            ++m_result.modulesRun;
        m_current = -1;
        m_record = ModuleRecord();
    }

    void ModuleStarted(const ModuleRecord &record) override
    {
        if (m_run.m_observer)
            m_run.m_observer->ModuleStarted(record);
    }

    void ModuleWaiting(const ModuleRecord &record, const QString &waitingFor, qint64 elapsedMs) override
    {
        if (m_run.m_observer)
            m_run.m_observer->ModuleWaiting(record, waitingFor, elapsedMs);
    }

    void ModuleEnded(const ModuleRecord &record) override
    {
        m_record = record;
        // The wall time of every module that ran to its verdicts is kept
        // beside the handset's processed results, to balance later shards.
        if (record.outcome == ModuleSource::Recorded) {
            const QString path = ModuleTimings::PathBeside(m_harness.GetProcessedResultsPath());
            QString error;
            if (!ModuleTimings::Record(
                    path, record.name, record.source,
                    {record.durationMs, record.handset, QSysInfo::machineHostName(), QDateTime::currentDateTimeUtc()},
                    &error))
                m_run.LogMessage(
                    QStringLiteral("Warning: the time of %1 could not be recorded: %2\n").arg(record.name, error));
        }
        if (m_run.m_observer)
            m_run.m_observer->ModuleEnded(record);
    }

    bool KeepFrameworks() const override { return true; }

private:
    QString Name() const
    {
        const QString connected = m_harness.ConnectedTarget();
        return connected.isEmpty() ? m_result.target : connected;
    }

    void Work()
    {
        const Clock::Timer timer;
        // A target that names a listed handset exactly means that handset
        // and no other whose name merely contains it.
        QList<ConnectTarget> listed;
        Harness::ListTargets(listed);
        bool exact = false;
        for (const ConnectTarget &target : std::as_const(listed)) {
            if (target.name == m_harness.GetTarget()) {
                exact = true;
                m_harness.ConnectToTarget(target);
            }
        }
        m_harness.SetRunObserver(this);
        if (!exact || !m_harness.ConnectedTarget().isEmpty())
            m_harness.Run(*this);
        m_harness.SetRunObserver(nullptr);
        m_result.handset = Name();
        m_result.connected = !m_harness.ConnectedTarget().isEmpty();
        // The thread that opened the connection closes it: no handset object
        // outlives its worker or passes to another thread.
        m_harness.DisconnectTarget();
        // A module still in hand when the loop gave up goes back for the others.
        if (m_current >= 0)
            Finished(nullptr, Interrupted);
        if (m_exhausted)
            return;
        m_result.lost = true;
        m_result.lostAt = QDateTime::currentDateTime();
        m_result.lostAfterMs = timer.Elapsed();
        m_run.LogMessage(QStringLiteral("Handset %1 dropped out at %2 (%3 ms into the run); %4 left for the "
                                        "other handsets.\n")
                             .arg(m_result.handset, m_result.lostAt.toString(QStringLiteral("yyyy-MM-dd hh:mm:ss.zzz")))
                             .arg(m_result.lostAfterMs)
                             .arg(ModuleCount(m_queue.Pending())));
    }

    ShardedRun &m_run;
    Queue &m_queue;
    Harness &m_harness;
    HandsetResult &m_result;
    QHash<qsizetype, QSharedPointer<_TestModule>> m_modules;
    QStringList m_names;
    qsizetype m_current = -1;
    qsizetype m_testCasesFor = -1;
    QStringList m_testCases;
    bool m_exhausted = false;
    ModuleRecord m_record;
    std::thread m_thread;
};

ShardedRun::ShardedRun(Log *logger) : m_logger(logger)
{
}

ShardedRun::~ShardedRun() = default;

void ShardedRun::AddHandset(Harness *harness)
{
    if (harness && !m_harnesses.contains(harness))
        m_harnesses.append(harness);
}

void ShardedRun::SetTestCases(const QStringList &testCases)
{
    m_testCases = testCases;
}

void ShardedRun::SetObserver(RunObserver *observer)
{
    m_observer = observer;
}

void ShardedRun::LogMessage(const QString &message) const
{
    if (m_logger)
        m_logger->LogMessage(message, true);
}

bool ShardedRun::Run(const QList<QSharedPointer<_TestModule>> &selection)
{
    m_modules.clear();
    m_handsets.clear();
    QList<QSharedPointer<_TestModule>> order;
    for (const QSharedPointer<_TestModule> &module : selection) {
        if (module)
            order.append(module);
    }
    Harness::SortForRun(order);
    QSet<QString> seen;
    for (const QSharedPointer<_TestModule> &module : order) {
        ModuleResult entry;
        entry.name = module->moduleName;
        entry.source = module->Source();
        entry.testType = module->TestType();
        if (seen.contains(entry.source + QLatin1Char('/') + entry.name.toLower()))
            continue;
        seen.insert(entry.source + QLatin1Char('/') + entry.name.toLower());
        m_modules.append(entry);
    }
    if (m_modules.isEmpty()) {
        LogMessage(QStringLiteral("No modules to run."));
        return false;
    }
    if (m_harnesses.isEmpty()) {
        LogMessage(QStringLiteral("No handsets to run on.\n"));
        return false;
    }
    LogMessage(QStringLiteral("Running %1 on %2\n")
                   .arg(ModuleCount(m_modules.size()),
                        m_harnesses.size() == 1 ? QStringLiteral("1 handset")
                                                : QStringLiteral("%1 handsets").arg(m_harnesses.size())));

    for (Harness *harness : std::as_const(m_harnesses)) {
        HandsetResult handset;
        handset.target = harness->GetTarget();
        handset.handset = handset.target;
        m_handsets.append(handset);
    }
    Queue queue(m_modules, m_stop);
    std::vector<std::unique_ptr<Worker>> workers;
    for (qsizetype i = 0; i < m_harnesses.size(); ++i) {
        workers.push_back(std::make_unique<Worker>(*this, queue, *m_harnesses.at(i), m_handsets[i]));
        workers.back()->Prepare(m_modules);
    }
    for (const std::unique_ptr<Worker> &worker : workers)
        worker->Start(0, m_testCases);
    for (const std::unique_ptr<Worker> &worker : workers)
        worker->Join();

    const QStringList notRun = NotRun();
    if (!notRun.isEmpty() && m_stop) {
        LogMessage(QStringLiteral("The run was stopped; modules not run: %1\n").arg(notRun.join(QStringLiteral(", "))));
    } else if (!notRun.isEmpty()) {
        LogMessage(QStringLiteral("Every handset has dropped out; %1 never ran: %2\n")
                       .arg(ModuleCount(notRun.size()))
                       .arg(notRun.join(QStringLiteral(", "))));
    }
    return notRun.isEmpty();
}

void ShardedRun::Stop()
{
    m_stop = true;
}

bool ShardedRun::Stopped() const
{
    return m_stop;
}

QList<ShardedRun::ModuleResult> ShardedRun::Modules() const
{
    return m_modules;
}

QList<ShardedRun::HandsetResult> ShardedRun::Handsets() const
{
    return m_handsets;
}

QStringList ShardedRun::NotRun() const
{
    QStringList names;
    for (const ModuleResult &module : m_modules) {
        if (!module.ran)
            names.append(module.name);
    }
    return names;
}
