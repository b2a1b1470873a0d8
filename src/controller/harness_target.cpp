// The target handset: choosing, connecting, disconnecting, and the
// operations that need a connection.

#include "controller/harness.h"

#include "controller/environmentkeys.h"
#include "environment/testdirectories.h"
#include "handset/connectfactory.h"

bool Harness::Initialize()
{
    return ConnectFactory::Initialize();
}

void Harness::Uninitialize()
{
    ConnectFactory::Uninitialize();
}

unsigned int Harness::ListTargets(QList<ConnectTarget> &targets)
{
    targets.clear();
    ConnectFactory::ListTargets(targets);
    return unsigned(targets.size());
}

void Harness::SetTarget(const QString &name)
{
    if (name.isEmpty() || name == m_target)
        return;
    m_target = name;
    // The old handset's connection is dropped without a goodbye; the next
    // operation connects to the new one.
    delete m_device;
    m_device = nullptr;
}

bool Harness::IsTargetAvailable()
{
    QList<ConnectTarget> targets;
    return ConnectFactory::ListTargets(targets) > 0;
}

bool Harness::ConnectToTarget(const QString &name)
{
    if (m_device)
        return true;

    QString wanted = name.toLower();
    if (wanted.isEmpty())
        wanted = m_target.toLower();

    QList<ConnectTarget> targets;
    ConnectFactory::ListTargets(targets);
    for (const ConnectTarget &target : targets) {
        const bool matches = wanted.isEmpty() || target.description.toLower().contains(wanted)
            || target.name.toLower().contains(wanted);
        if (matches && ConnectToTarget(target)) {
            LogMessage(QStringLiteral("Connected to target: %1").arg(target.name), true);
            return true;
        }
    }
    LogMessage(QStringLiteral("Target %1 not found.").arg(m_target), true);
    return false;
}

bool Harness::ConnectToTarget(const ConnectTarget &target)
{
    if (m_device)
        return true;

    m_device = ConnectFactory::ConnectToTarget(target, m_logger);
    if (!m_device) {
        LogMessage(QStringLiteral("Gateway could not connect to device %1.").arg(target.name), true);
        return false;
    }

    const QString handset = m_device->GetConnectTarget().name;
    if (!m_environment.contains(EnvironmentKey::LogPath))
        m_environment.insert(EnvironmentKey::LogPath, TestDirectories::GetLogDirectory(handset));
    if (!m_environment.contains(EnvironmentKey::ProcessedResultsPath))
        m_environment.insert(EnvironmentKey::ProcessedResultsPath, TestDirectories::GetProcessResultsPath(handset));

    QString version;
    if (m_device->GetPlatformVersion(version) == 0 && !version.isEmpty())
        m_environment.insert(EnvironmentKey::KestoVersion, version);
    return true;
}

void Harness::DisconnectTarget()
{
    if (!m_device)
        return;
    ConnectFactory::DisconnectTarget(m_device);
    m_device = nullptr;
}

bool Harness::CopyFileFromDevice(const QString &handsetPath, const QString &hostPath)
{
    if (!ConnectToTarget(m_target) || !m_device)
        return false;
    return m_device->CopyFileFromDevice(handsetPath, hostPath) == 0;
}

QString Harness::GetDefaultLogFilePath()
{
    if (!ConnectToTarget(m_target) || !m_device)
        return QString();
    return TestDirectories::GetLogDirectory(m_device->GetConnectTarget().name);
}
