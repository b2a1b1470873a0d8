#include "device/device.h"

unsigned int IKestoDevice::DeleteDirectory(unsigned int classId)
{
    QString directory;
    const unsigned int result = FindModule(classId, directory);
    if (result != 0)
        return result;
    return RemoveDirectory(directory);
}

QString IKestoDevice::TargetToString(Platform platform)
{
    switch (platform) {
    case PLATFORM_ARM:
        return QStringLiteral("arm");
    case PLATFORM_WIN32:
        return QStringLiteral("win32");
    case PLATFORM_UNKNOWN:
        break;
    }
    return QStringLiteral("unknown");
}

IKestoDevice::Platform IKestoDevice::StringToTarget(const QString &text)
{
    const QString word = text.trimmed().toLower();
    if (word == QLatin1String("arm") || word == QLatin1String("1"))
        return PLATFORM_ARM;
    if (word == QLatin1String("win32") || word == QLatin1String("2"))
        return PLATFORM_WIN32;
    return PLATFORM_UNKNOWN;
}
