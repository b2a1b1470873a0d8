// The processed-results file: recording the verdicts of one module's logs.

#include "controller/harness.h"

#include "catalogue/manifest.h"
#include "catalogue/testmodule.h"
#include "catalogue/testresults.h"
#include "controller/environmentkeys.h"
#include "controller/processedresults.h"
#include "controller/resultssession.h"

#include <QDir>

Harness::ResultsSession::ResultsSession(Harness &harness, bool deferSave)
    : m_harness(harness), m_owner(!harness.m_results)
{
    if (m_owner) {
        m_harness.m_results.reset(new ProcessedResults);
        m_harness.m_deferResultsSave = deferSave;
    }
}

Harness::ResultsSession::~ResultsSession()
{
    if (!m_owner)
        return;
    ProcessedResults *results = m_harness.m_results.data();
    // A document that was never opened has no path and nothing to write.
    if (m_harness.m_deferResultsSave && results->savePending)
        results->Save();
    m_harness.m_results.reset();
    m_harness.m_deferResultsSave = false;
}

void Harness::EnsureProcessedResultsPath(const QString &folder)
{
    const QString logPath = m_environment.value(EnvironmentKey::LogPath);
    // Without a log folder there is nowhere to put the file; the folder must
    // never land at the file system's root.
    if (m_environment.contains(EnvironmentKey::ProcessedResultsPath) || logPath.isEmpty())
        return;
    const QString directory = logPath + QDir::separator() + folder;
    QDir().mkpath(directory);
    m_environment.insert(EnvironmentKey::ProcessedResultsPath,
                         QDir::cleanPath(directory + QDir::separator() + QStringLiteral("ProcessedResults.xml")));
}

void Harness::UpdateProcessedModulesXML(QSharedPointer<_TestModule> module)
{
    TestResults parsed;
    RecordVerdicts(module, parsed);
}

bool Harness::RecordVerdicts(QSharedPointer<_TestModule> module, TestResults &parsed)
{
    if (!module)
        return false;
    EnsureProcessedResultsPath(QStringLiteral("processedResults"));
    const QString path = m_environment.value(EnvironmentKey::ProcessedResultsPath);

    // Run and Process hold the document between modules; on its own a call
    // reads the file afresh.
    QSharedPointer<ProcessedResults> results = m_results;
    if (!results)
        results.reset(new ProcessedResults);
    if (results->Path() != path || !results->Root())
        results->Open(path, m_kitManifest.data(), m_platformManifest.data(), m_logger);

    if (!module->ParseLog(parsed))
        return false;

    QSharedPointer<_TestModule> known;
    if (m_kitManifest)
        known = m_kitManifest->FindTestModule(parsed.manifestName);
    if (!known && m_platformManifest)
        known = m_platformManifest->FindTestModule(parsed.manifestName);

    if (!known) {
        LogMessage(QStringLiteral("   Warning: Module Name:%1 not found in the manifests.\n").arg(parsed.manifestName),
                   true);
    } else {
        module->idHash = known->idHash;
        module->source = known->source;
        module->family = known->family;
        module->subFamily = known->subFamily;

        QString idHash = parsed.idHash;
        if (idHash.isEmpty())
            idHash = module->idHash;
        if (idHash.isEmpty())
            idHash = parsed.manifestName;
        for (const TestCaseResult &verdict : parsed.caseResults) {
            results->Record(idHash, parsed.manifestName, module->family, module->subFamily, verdict.testCase,
                            verdict.result);
        }
    }

    if (m_results && m_deferResultsSave)
        results->savePending = true;
    else
        results->Save();
    return true;
}
