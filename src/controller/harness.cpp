// The Harness object: construction, configuration and logging.

#include "controller/harness.h"

#include "controller/environmentkeys.h"
#include "environment/testdirectories.h"
#include "log/log.h"

Harness::Harness()
{
    m_environment.insert(EnvironmentKey::DataCachePath, TestDirectories::GetTestDataPath());
    m_environment.insert(EnvironmentKey::KeyDevicePackSpecified, QStringLiteral("false"));
    m_environment.insert(EnvironmentKey::TestDataSpecified, QStringLiteral("false"));
}

Harness::~Harness()
{
    // Nobody can reach the connection once the object is gone, so a
    // connection the host left open is closed rather than leaked.
    DisconnectTarget();
}

unsigned int Harness::ListPlatforms(QList<Platform> &platforms)
{
    platforms.clear();
    return GetProPlatforms(platforms);
}

unsigned int Harness::ListTestKits(QList<TestKit> &kits)
{
    return GetTestKits(kits);
}

void Harness::SetLogger(Log *logger)
{
    m_logger = logger;
}

void Harness::LogMessage(const QString &message, bool echo)
{
    if (m_logger)
        m_logger->LogMessage(message, echo);
}

void Harness::SetRunObserver(RunObserver *observer)
{
    m_observer = observer;
}

void Harness::SetModuleTimeLimit(qint64 ms)
{
    m_moduleTimeLimitMs = qMax<qint64>(ms, 0);
}

void Harness::SetNoDelete(bool noDelete)
{
    m_noDelete = noDelete;
}

void Harness::SetRunOption(const QString &option)
{
    m_runOption = option;
}

void Harness::SetCopyDelay(const QString &delay)
{
    bool ok = false;
    const uint value = delay.toUInt(&ok, 10);
    m_copyDelay = ok ? value : 0;
}

void Harness::SetFamily(const QString &family, const QString &variant)
{
    if (family.isEmpty())
        return;
    m_family = family;
    m_familyVariant = variant;
    m_environmentReady = false;
}

bool Harness::ChangeSetting(const QString &key, const QString &value)
{
    if (value.isEmpty() || value == m_environment.value(key))
        return false;
    m_environment.insert(key, value);
    m_environmentReady = false;
    return true;
}

void Harness::SetTestkit(const QString &testkit)
{
    if (ChangeSetting(EnvironmentKey::KVK, testkit))
        m_kitManifest.reset();
}

QString Harness::GetTestkit() const
{
    return m_environment.value(EnvironmentKey::KVK);
}

void Harness::SetPlatform(const QString &platform)
{
    if (ChangeSetting(EnvironmentKey::Platform, platform))
        m_platformManifest.reset();
}

QString Harness::GetPlatform() const
{
    return m_environment.value(EnvironmentKey::Platform);
}

void Harness::SetLogOutputPath(const QString &path)
{
    m_environment.insert(EnvironmentKey::LogPath, path);
}

void Harness::SetProcessedResultsPath(const QString &path)
{
    if (!path.isEmpty())
        m_environment.insert(EnvironmentKey::ProcessedResultsPath, path);
}

QString Harness::GetProcessedResultsPath() const
{
    return m_environment.value(EnvironmentKey::ProcessedResultsPath);
}

void Harness::SetTestCases(const QStringList &testCases)
{
    m_testCases = testCases;
}
