// The run-time behaviour that every module kind shares.

#include "catalogue/testmodule.h"

#include "common/filewriter.h"
#include "modules/moduleutil.h"

#include <QDir>
#include <QFile>

namespace {

QString Unchanged(const QString &fileName, const QString &)
{
    return fileName;
}

} // namespace

bool _TestModule::InstallTest(IKestoDevice *device)
{
    if (!device)
        return false;
    const QSharedPointer<_CompilerVariant> variant = GetCompilerVariant(device->platform, false);
    if (!variant)
        return false;
    if (device->InstallPackage(variant->packagePath) != 0)
        return false;
    device->FindModule(KestoID(), deviceDirectory);
    return true;
}

bool _TestModule::RemoveTest(IKestoDevice *device)
{
    if (!device)
        return false;
    bool removed = false;
    if (!classids.isEmpty())
        removed = device->DeleteDirectory(classids.first()) == 0;
    if (!removed && !applets.isEmpty())
        removed = device->DeleteDirectory(applets.first().appletid) == 0;
    if (!removed)
        device->RemoveDirectory(QStringLiteral("fs:/usermods/") + moduleName);
    for (const QString &name : std::as_const(secondaryModules))
        device->RemoveDirectory(QStringLiteral("fs:/usermods/") + name);
    return removed;
}

bool _TestModule::ParseLog(TestResults &results)
{
    for (const QString &path : std::as_const(desktopLogFiles)) {
        if (ParseLog(path, results))
            return true;
    }
    return false;
}

bool _TestModule::CopyLog(IKestoDevice *device, QMap<QString, QString> &env)
{
    desktopLogFiles.clear();
    QStringList paths;
    if (!GetLogFilePaths(device, paths))
        return false;
    return CopyLogFiles(device, paths, env.value(QStringLiteral("LogPath")), Unchanged, false);
}

bool _TestModule::CopyLogFiles(IKestoDevice *device, const QStringList &paths, const QString &directory,
                               QString (*rename)(const QString &, const QString &), bool nameFileOnly)
{
    if (!device)
        return false;
    bool copied = false;
    for (const QString &path : paths) {
        const qsizetype slash = path.lastIndexOf(QLatin1Char('/'));
        if (slash < 0) {
            LogMessage(QStringLiteral("   Malformed source path %1\n").arg(path), true);
            continue;
        }
        const QString fileName = path.mid(slash + 1);
        const QString hostName = ModuleUtil::TimeStampedName(rename(fileName, moduleName));
        const QString destination = QDir::cleanPath(directory + QDir::separator() + hostName);
        const QString shown = nameFileOnly ? fileName : path;
        if (device->CopyFileFromDevice(path, destination) == 0) {
            LogMessage(QStringLiteral("   Log %1 copied to %2\n").arg(shown, destination), true);
            desktopLogFiles.append(destination);
            copied = true;
        } else {
            LogMessage(QStringLiteral("   Log %1 not copied to %2\n").arg(shown, destination), true);
        }
    }
    return copied;
}

void _TestModule::StampTextLog(const QString &hostPath, const QString &runId, StampAnchor anchor)
{
    QFile file(hostPath);
    if (!file.open(QIODevice::ReadWrite))
        return;
    const QByteArray content = file.readAll();
    if (file.error() != QFileDevice::NoError)
        return;
    file.close();

    // The log is worked on as bytes, so whatever encoding the handset wrote
    // survives the stamping unchanged.
    QList<QByteArray> lines = content.split('\n');
    qsizetype position = -1;
    for (qsizetype i = 0; i < lines.size(); ++i) {
        const QByteArray &line = lines.at(i);
        if (line.startsWith("GUID:"))
            break;
        if (anchor == StampAnchor::FirstTestLine && line.startsWith("Test:")) {
            position = i;
            break;
        }
        if (anchor == StampAnchor::LastModuleVerLine && line.startsWith("ModuleVer:"))
            position = i;
        if (anchor == StampAnchor::SecondLine && i == 1) {
            position = i;
            break;
        }
    }
    if (position < 0)
        position = lines.size();

    lines.insert(position, QByteArray("ID Hash:") + IDHash().toUtf8());
    lines.insert(position, QByteArray("Manifest Name:") + moduleName.toUtf8());
    lines.insert(position, QByteArray("GUID:") + runId.toUtf8());

    QByteArray stamped;
    stamped.reserve(content.size() + 256);
    for (const QByteArray &line : std::as_const(lines)) {
        stamped += line;
        stamped += '\n';
    }
    FileWriter::Write(hostPath, stamped, true);
}
