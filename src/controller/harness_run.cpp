// The run loop: frameworks, modules, log waits, copies and results.

#include "controller/harness.h"

#include "catalogue/framework.h"
#include "catalogue/manifest.h"
#include "catalogue/testmodule.h"
#include "common/clock.h"
#include "controller/resultssession.h"

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
        if (m_device->connectionLost) {
            LogMessage(kConnectionDied, true);
            return false;
        }
        if (timer.Elapsed() > kLogWaitLimitMs || module->IsLogComplete(m_device))
            return true;
        Clock::Sleep(m_device->platform == IKestoDevice::PLATFORM_WIN32 ? kFastPollMs : kPollMs);
    }
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
    std::stable_sort(order.begin(), order.end(), RunsBefore);

    const ResultsSession session(*this, false);
    QSharedPointer<_Framework> framework;
    bool frameworkWasLoaded = false;
    bool result = false;

    for (const QSharedPointer<_TestModule> &module : order) {
        module->SetLogger(m_logger);
        const QString name = module->moduleName;
        const QString testType = module->TestType();

        if (!framework || testType != framework->name) {
            if (framework && !frameworkWasLoaded) {
                LogMessage(QStringLiteral("Unloading Framework %1\n").arg(framework->name), true);
                framework->Unload(m_device, m_environment);
            }
            framework = GetFramework(testType);
            if (!framework) {
                LogMessage(QStringLiteral("Framework %1 not found.\n").arg(testType), true);
                result = true;
                continue;
            }
            framework->SetLogger(m_logger);
            if (framework->IsLoaded(m_device)) {
                framework->PostLoad(m_device, m_environment);
                LogMessage(
                    QStringLiteral("Harness::Run Framework %1 already loaded").arg(framework->name),
                    false);
                frameworkWasLoaded = true;
            } else {
                LogMessage(QStringLiteral("Loading Framework %1\n").arg(framework->name), true);
                framework->Load(m_device, m_environment);
                frameworkWasLoaded = false;
            }
        }

        LogMessage(QStringLiteral("Running %1 test %2 ID:%3\n")
                       .arg(module->Source(), name, module->ModuleName()),
                   true);
        if (!m_testCases.isEmpty()) {
            module->SetTestCases(m_testCases);
            m_testCases.clear();
        }
        module->SetRunOption(m_runOption);

        result = true;
        if (!Run(module)) {
            LogMessage(QStringLiteral("Test %1 Failed\n").arg(name), true);
            // A handset that went away fails every module after this one.
            if (m_device->connectionLost) {
                LogMessage(kConnectionDied, true);
                return false;
            }
            continue;
        }

        LogMessage(QStringLiteral("   Test %1 Run\n").arg(name), true);
        if (!WaitForLog(module))
            return false;

        if (m_copyDelay > 0) {
            LogMessage(QStringLiteral("   Sleeping %1 Milliseconds\n").arg(m_copyDelay), true);
            Clock::Sleep(m_copyDelay);
        }
        if (!module->CopyLog(m_device, m_environment)) {
            LogMessage(QStringLiteral("   No logs found for %1\n").arg(name), true);
            continue;
        }
        if (!m_noDelete) {
            module->RemoveTest(m_device);
            LogMessage(QStringLiteral("   Removing test %1\n").arg(name), true);
        }
        module->PostProcess(m_environment);
        UpdateProcessedModulesXML(module);
    }

    if (framework && !frameworkWasLoaded) {
        LogMessage(QStringLiteral("Unloading Framework %1\n").arg(framework->name), true);
        framework->Unload(m_device, m_environment);
    }
    return result;
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
        const struct {
            QSharedPointer<Manifest> catalogue;
            const char *message;
        } catalogues[] = {
            {m_kitManifest, "   Loading Secondary Module from KVK: %1\n"},
            {m_platformManifest, "   Loading Secondary Module from PVS: %1\n"},
        };
        for (const auto &entry : catalogues) {
            if (!entry.catalogue)
                continue;
            const QSharedPointer<_TestModule> secondary =
                entry.catalogue->FindTestModule(secondaryName);
            if (!secondary)
                continue;
            found = true;
            LogMessage(QString::fromLatin1(entry.message).arg(secondaryName), true);
            secondary->SetLogger(m_logger);
            secondary->InstallTest(m_device);
        }
        if (!found) {
            LogMessage(QStringLiteral("   Warning: Secondary Module %1 not found.\n").arg(secondaryName),
                       true);
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
