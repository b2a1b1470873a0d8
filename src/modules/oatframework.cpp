#include "modules/oatframework.h"

#include "modules/oattestmodule.h"

#include <QDir>

namespace {

const QString kFallbackDirectory = QStringLiteral("fs:/usermods/oat/");
const QString kDevicePackFlag = QStringLiteral("KeyDevicePackSpecified");
const QString kTestDataFlag = QStringLiteral("TestDataSpecified");
const QString kRawLogKey = QStringLiteral("OatRawLogPath");

} // namespace

_OatFramework::_OatFramework() = default;
_OatFramework::~_OatFramework() = default;

bool _OatFramework::IsLoaded(IKestoDevice *device)
{
    if (!device)
        return false;
    QString directory;
    if (device->FindModule(kClassId, directory) == 0)
        return true;
    QSharedPointer<_DirectoryInfo> listing;
    if (device->ListDirectory(ClassDirectory(kClassId), listing) != 0 || !listing)
        return false;
    return listing->HasFiles();
}

bool _OatFramework::Load(IKestoDevice *device, QMap<QString, QString> &env)
{
    if (!device)
        return false;
    const QSharedPointer<_CompilerVariant> variant = GetVariant(device->platform);
    if (!variant)
        return false;
    if (device->InstallPackage(variant->packagePath) != 0)
        return false;

    // A fresh load pushes whatever the environment names; the flags are put
    // back afterwards so that later PostLoads push only what was asked for.
    const QString devicePackFlag = env.value(kDevicePackFlag);
    const QString testDataFlag = env.value(kTestDataFlag);
    env.insert(kDevicePackFlag, QStringLiteral("true"));
    env.insert(kTestDataFlag, QStringLiteral("true"));
    PostLoad(device, env);
    for (const auto &[key, value] :
         {std::pair{kDevicePackFlag, devicePackFlag}, std::pair{kTestDataFlag, testDataFlag}}) {
        if (value.isEmpty())
            env.remove(key);
        else
            env.insert(key, value);
    }
    return true;
}

bool _OatFramework::PostLoad(IKestoDevice *device, QMap<QString, QString> &env)
{
    if (!device)
        return true;
    const bool pushDevicePack = env.value(kDevicePackFlag) == QLatin1String("true");
    const bool pushTestData = env.value(kTestDataFlag) == QLatin1String("true");
    QString directory;
    if (device->FindModule(kClassId, directory) != 0)
        directory.clear();
    if (directory.isEmpty())
        directory = kFallbackDirectory;

    const QString testData = env.value(QStringLiteral("TestDataCachePath"));
    if (pushTestData && !testData.isEmpty())
        device->CopyFileToDevice(testData, directory + QStringLiteral("testdata.kar"));
    const QString devicePack = env.value(QStringLiteral("DevicePackCachePath"));
    if (pushDevicePack && !devicePack.isEmpty())
        device->CopyFileToDevice(devicePack, directory + QStringLiteral("testdata2.kar"));
    return true;
}

void _OatFramework::Unload(IKestoDevice *device, QMap<QString, QString> &)
{
    if (!device)
        return;
    device->RemoveDirectory(QStringLiteral("fs:/usermods/oat/"));
    device->RemoveDirectory(QStringLiteral("fs:/usermods/oatinterfaceext/"));
    device->RemoveDirectory(QStringLiteral("fs:/usermods/oatresourceext/"));
}

void _OatFramework::PostProcess(QMap<QString, QString> &env)
{
    const bool added = !env.contains(kRawLogKey);
    if (added)
        env.insert(
            kRawLogKey,
            QDir::cleanPath(env.value(QStringLiteral("LogPath")) + QStringLiteral("/") + QStringLiteral("oatRawLogs")));
    OatTestModule module;
    module.SetLogger(logger);
    module.PostProcess(env);
    module.SetLogger(nullptr);
    if (added)
        env.remove(kRawLogKey);
}
