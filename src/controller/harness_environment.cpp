// The environment map: test kit and platform resolution, the run identity,
// and the compiled caches of test data and device packs.

#include "controller/harness.h"

#include "common/stringhash.h"
#include "controller/environmentkeys.h"
#include "environment/devicexml.h"
#include "environment/platforms.h"
#include "environment/testdirectories.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QUuid>

namespace {

const QString kDefault = QStringLiteral("*");
const QString kPlatformSubdirectory = QStringLiteral("/pvs/platform");
const QString kTrue = QStringLiteral("true");
const QString kCompileErrorMessage = QStringLiteral("Resource Compile Error: %1 can not be compiled into %2.\n");

// The path a source file is known by: absolute against the current
// directory and cleaned, so relative and absolute spellings agree.
QString SourceIdentity(const QString &path)
{
    return QDir::cleanPath(QDir().absoluteFilePath(path));
}

// A cache file is fresh when it exists and the source was last modified
// strictly before it.
bool IsFresh(const QString &source, const QString &cacheFile)
{
    const QFileInfo cache(cacheFile);
    return cache.exists() && QFileInfo(source).lastModified() < cache.lastModified();
}

// Deletes a stale cache file; false when it is there and cannot be deleted.
bool RemoveStale(const QString &cacheFile)
{
    return !QFileInfo::exists(cacheFile) || QFile::remove(cacheFile);
}

// The first entry, in list order, whose lower-cased name contains the
// lower-cased request; null when none.
template <typename Record> const Record *FindByName(const QList<Record> &records, const QString &request)
{
    const QString wanted = request.toLower();
    for (const Record &record : records) {
        if (record.name.toLower().contains(wanted))
            return &record;
    }
    return nullptr;
}

} // namespace

bool Harness::RefreshCache(const QString &source, const QString &cacheFile,
                           bool (Harness::*compile)(const QString &, const QString &))
{
    if (IsFresh(source, cacheFile))
        return true;
    if (RemoveStale(cacheFile) && (this->*compile)(source, cacheFile))
        return true;
    // Whatever a failed compile left would otherwise look fresh next time.
    QFile::remove(cacheFile);
    return false;
}

void Harness::SetTestData(const QString &path)
{
    if (!QFileInfo(path).isFile()) {
        LogMessage(QStringLiteral("Test data %1 is not valid.\n").arg(path), true);
        return;
    }

    const QString cacheFile = TestDirectories::GetTestDataCacheFilePath(StringHashName(SourceIdentity(path)));
    m_environment.insert(EnvironmentKey::TestDataCachePath, cacheFile);
    if (!RefreshCache(path, cacheFile, &Harness::CompileResource)) {
        LogMessage(kCompileErrorMessage.arg(path, cacheFile), true);
        m_environment.remove(EnvironmentKey::TestDataCachePath);
    }
    m_environment.insert(EnvironmentKey::TestDataSpecified, kTrue);
}

void Harness::SetDPK(const QString &path)
{
    if (!QFileInfo(path).isFile()) {
        LogMessage(QStringLiteral("DPK %1 is not valid.\n").arg(path), true);
        return;
    }

    const QString identity = SourceIdentity(path);
    const QString key = StringHashName(identity);
    const QString cacheFile = TestDirectories::GetTestDataCacheFilePath(key);
    const QString dsoFile = TestDirectories::GetDSOCacheFilePath(key);
    m_environment.insert(EnvironmentKey::DevicePack, identity);
    m_environment.insert(EnvironmentKey::DevicePackCachePath, cacheFile);

    if (!RefreshCache(path, cacheFile, &Harness::AltCompileResource)) {
        LogMessage(kCompileErrorMessage.arg(path, cacheFile), true);
        m_environment.remove(EnvironmentKey::DevicePackCachePath);
    }

    bool flattened = IsFresh(path, dsoFile);
    if (!flattened && RemoveStale(dsoFile))
        flattened = FlattenDeviceXml(path, dsoFile);
    m_environment.insert(EnvironmentKey::DSOCacheFilePath, flattened ? dsoFile : path);

    m_environment.insert(EnvironmentKey::KeyDevicePackSpecified, kTrue);
}

bool Harness::SetupEnvironment()
{
    if (m_environmentReady)
        return true;

    m_environment.insert(EnvironmentKey::PerlCache, TestDirectories::GetOatPerlScripts());
    m_environment.insert(EnvironmentKey::TestRunID, QUuid::createUuid().toString());
    // A kit that an earlier set-up chose only to support the platform stays
    // unselected while it is still the kit in use.
    m_kitNotSelected = m_kitNotSelected && !m_defaultOnlyKit.isEmpty() && GetTestkit() == m_defaultOnlyKit;

    if (GetTestkit().isEmpty() && GetPlatform().isEmpty()) {
        SetTestkit(kDefault);
        SetPlatform(kDefault);
    }

    const QString requestedKit = GetTestkit();
    bool kitForPlatformOnly = false;
    if (requestedKit.isEmpty() || requestedKit == kDefault) {
        TestKit kit;
        if (GetDefaultTestKit(kit)) {
            kitForPlatformOnly = requestedKit.isEmpty();
            SetTestkit(kit.path);
        }
    } else {
        QList<TestKit> kits;
        GetTestKits(kits);
        if (const TestKit *kit = FindByName(kits, requestedKit))
            SetTestkit(kit->path);
    }

    const QString requestedPlatform = GetPlatform();
    if (!requestedPlatform.isEmpty()) {
        QList<Platform> platforms;
        GetProPlatforms(platforms);
        if (requestedPlatform == kDefault) {
            for (const Platform &platform : platforms) {
                if (platform.isDefault) {
                    SetPlatform(platform.path);
                    break;
                }
            }
        } else if (const Platform *platform = FindByName(platforms, requestedPlatform)) {
            SetPlatform(platform->path);
        }
    }

    const QString kit = GetTestkit();
    if (kit.isEmpty()) {
        LogMessage(QStringLiteral("KVK not found.  A Kesto Validation Kit is required"), true);
        return false;
    }
    if (kit == kDefault) {
        LogMessage(QStringLiteral("Default KVK not found"), true);
    } else {
        SetTestkit(QDir().absoluteFilePath(kit));
        LogMessage(QStringLiteral("KVK: ") + GetTestkit(), true);
    }
    if (kitForPlatformOnly) {
        m_kitNotSelected = true;
        m_defaultOnlyKit = GetTestkit();
    }

    const QString platform = GetPlatform();
    if (platform.isEmpty()) {
        LogMessage(QStringLiteral("Platform not used"), true);
    } else if (platform == kDefault) {
        LogMessage(QStringLiteral("Default platform not found"), true);
    } else {
        QString resolved = QDir::cleanPath(QDir().absoluteFilePath(platform));
        // A platform resolved by an earlier set-up already names its
        // platform folder; running set-up again must not nest it twice.
        if (!resolved.endsWith(kPlatformSubdirectory))
            resolved = QDir::cleanPath(resolved + kPlatformSubdirectory);
        SetPlatform(resolved);
        LogMessage(QStringLiteral("Platform: ") + resolved, true);
    }

    m_environmentReady = true;
    return true;
}
