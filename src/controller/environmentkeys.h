#pragma once

#include <QString>

// The keys of the Harness environment map. Frameworks and modules read the
// same keys; stored logs and scripts rely on the exact texts.
namespace EnvironmentKey {

inline const QString DataCachePath = QStringLiteral("DataCachePath");
inline const QString KeyDevicePackSpecified = QStringLiteral("KeyDevicePackSpecified");
inline const QString TestDataSpecified = QStringLiteral("TestDataSpecified");
inline const QString KVK = QStringLiteral("KVK");
inline const QString Platform = QStringLiteral("Platform");
inline const QString PerlCache = QStringLiteral("PerlCache");
inline const QString TestRunID = QStringLiteral("TestRunID");
inline const QString DevicePack = QStringLiteral("DevicePack");
inline const QString DevicePackCachePath = QStringLiteral("DevicePackCachePath");
inline const QString DSOCacheFilePath = QStringLiteral("DSOCacheFilePath");
inline const QString TestDataCachePath = QStringLiteral("TestDataCachePath");
inline const QString LogPath = QStringLiteral("LogPath");
inline const QString ProcessedResultsPath = QStringLiteral("ProcessedResultsPath");
inline const QString KestoVersion = QStringLiteral("KestoVersion");
inline const QString OatRawLogPath = QStringLiteral("OatRawLogPath");

} // namespace EnvironmentKey
