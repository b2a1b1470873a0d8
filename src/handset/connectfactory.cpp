// The device connection of this library: every handset is an emulated one,
// a folder below the handsets folder (see EmulatedHandset).

#include "handset/connectfactory.h"

#include "handset/emulatedhandset.h"
#include "log/log.h"

#include <QDir>
#include <QFileInfo>
#include <QSettings>
#include <QStandardPaths>

namespace {

constexpr char kHandsetsVariable[] = "KESTIX_HANDSETS";
constexpr char kDataRootVariable[] = "KESTIX_DATA_ROOT";

// The folder that holds the handsets: KESTIX_HANDSETS, or else
// Norvane/Handsets below the base folder of the library's host files.
QString HandsetsFolder()
{
    const QString handsets = qEnvironmentVariable(kHandsetsVariable);
    if (!handsets.isEmpty())
        return QDir::cleanPath(QDir(handsets).absolutePath());
    QString base = qEnvironmentVariable(kDataRootVariable);
    if (base.isEmpty())
        base = QStandardPaths::writableLocation(QStandardPaths::GenericDataLocation);
    return QDir::cleanPath(base + QStringLiteral("/Norvane/Handsets"));
}

// The folder of the handset named name, or empty when there is none: the
// name must be one plain folder name.
QString HandsetFolder(const QString &name)
{
    if (name.isEmpty() || name == QLatin1String(".") || name == QLatin1String("..") || name.contains(QLatin1Char('/'))
        || name.contains(QChar(0)))
        return QString();
    const QString folder = HandsetsFolder() + QLatin1Char('/') + name;
    if (!QFileInfo(EmulatedHandset::SettingsPath(folder)).isFile())
        return QString();
    return folder;
}

void Report(Log *log, const QString &message)
{
    if (log)
        log->LogMessage(message, true);
}

} // namespace

bool ConnectFactory::Initialize()
{
    return true;
}

void ConnectFactory::Uninitialize()
{
}

unsigned int ConnectFactory::ListTargets(QList<ConnectTarget> &targets)
{
    targets.clear();
    const QDir handsets(HandsetsFolder());
    const QStringList names
        = handsets.entryList(QDir::Dirs | QDir::NoDotAndDotDot | QDir::Hidden, QDir::Name | QDir::IgnoreCase);
    for (const QString &name : names) {
        const QString folder = HandsetFolder(name);
        if (folder.isEmpty())
            continue;
        const QSettings settings(EmulatedHandset::SettingsPath(folder), QSettings::IniFormat);
        QString description = settings.value(QStringLiteral("description")).toString();
        if (description.isEmpty())
            description = name;
        targets.append(ConnectTarget(name, description));
    }
    return unsigned(targets.size());
}

IKestoDevice *ConnectFactory::ConnectToTarget(const ConnectTarget &target, Log *log)
{
    const QString folder = HandsetFolder(target.name);
    if (folder.isEmpty()) {
        Report(log, QStringLiteral("Handset %1 not found in %2.\n").arg(target.name, HandsetsFolder()));
        return nullptr;
    }
    auto *device = new EmulatedHandset(target, folder);
    if (!device->IsReachable()) {
        Report(log, QStringLiteral("Handset %1 is offline.\n").arg(target.name));
        delete device;
        return nullptr;
    }
    device->SetLogger(log);
    return device;
}

void ConnectFactory::DisconnectTarget(IKestoDevice *device)
{
    delete device;
}
