// Reprocessing saved logs into the processed-results file.

#include "controller/harness.h"

#include "catalogue/manifest.h"
#include "catalogue/testmodule.h"
#include "controller/environmentkeys.h"
#include "controller/resultssession.h"
#include "modules/oatframework.h"

#include <QDir>
#include <QFileInfo>

namespace {

// Folders of a log tree that hold no logs of their own.
bool IsSkippedFolder(const QString &name)
{
    return name.compare(QLatin1String("oatRawLogs"), Qt::CaseInsensitive) == 0
        || name.compare(QLatin1String("ProcessedResults"), Qt::CaseInsensitive) == 0;
}

} // namespace

bool Harness::Process(int depth)
{
    const QString indent(qMax(depth, 0), QLatin1Char(' '));
    const QString logPath = m_environment.value(EnvironmentKey::LogPath);
    if (logPath.isEmpty()) {
        LogMessage(QStringLiteral("Harness::Process No log folder: set a log output path or "
                                  "connect to a handset first."),
                   true);
        return false;
    }
    // The outermost call holds the results document for the whole tree and
    // writes it once, when it returns.
    const ResultsSession session(*this, true);

    EnsureProcessedResultsPath(QStringLiteral("ProcessedResults"));
    if (!Setup()) {
        LogMessage(QStringLiteral("Harness::Process Setup failed."), true);
        return false;
    }

    const QString rawLogs = QDir::cleanPath(logPath + QStringLiteral("/oatRawLogs"));
    m_environment.insert(EnvironmentKey::OatRawLogPath, rawLogs);
    if (QFileInfo(rawLogs).isDir()) {
        _OatFramework framework;
        framework.SetLogger(m_logger);
        framework.PostProcess(m_environment);
    }

    LogMessage(indent + QStringLiteral("   Parsing Logs"), true);
    const QDir folder(logPath);
    const QFileInfoList logs = folder.entryInfoList(
        {QStringLiteral("*.oat"), QStringLiteral("*.log"), QStringLiteral("*.txt")}, QDir::Files, QDir::Type);
    for (const QFileInfo &log : logs) {
        const QString path = log.absoluteFilePath();
        const QSharedPointer<_TestModule> module = Manifest::CreateTestModuleFromLog(path);
        if (!module)
            continue;
        module->SetLogger(m_logger);
        module->AddDesktopLogFile(path);
        LogMessage(indent + QStringLiteral("   Processing Log %1").arg(log.fileName()), true);
        UpdateProcessedModulesXML(module);
    }

    // Sorted, so the same tree always gives the same file; links are not
    // followed, so a link back up the tree cannot make the walk endless.
    const QFileInfoList folders
        = folder.entryInfoList(QDir::Dirs | QDir::NoDotAndDotDot | QDir::NoSymLinks, QDir::Name | QDir::IgnoreCase);
    for (const QFileInfo &sub : folders) {
        if (IsSkippedFolder(sub.fileName()))
            continue;
        m_environment.insert(EnvironmentKey::LogPath, sub.absoluteFilePath());
        LogMessage(indent + QStringLiteral("   Processing Sub Directory %1").arg(sub.absoluteFilePath()), true);
        Process(depth + 3);
        m_environment.insert(EnvironmentKey::LogPath, logPath);
    }

    LogMessage(indent + QStringLiteral("   Process Complete"), true);
    return true;
}

unsigned int Harness::GetLogFilePaths(QSharedPointer<_TestModule> module, QStringList &paths)
{
    paths.clear();
    if (module && ConnectToTarget(m_target) && m_device)
        module->GetLogFilePaths(m_device, paths);
    return unsigned(paths.size());
}
