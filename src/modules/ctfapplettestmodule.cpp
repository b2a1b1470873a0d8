#include "modules/ctfapplettestmodule.h"

#include "modules/ctftestmodule.h"
#include "modules/moduleutil.h"

#include <QDir>

using namespace ModuleUtil;

namespace {

QString AppletHostName(const QString &fileName, const QString &)
{
    QString name = fileName;
    if (name.contains(QStringLiteral("_k."), Qt::CaseInsensitive))
        name.replace(QStringLiteral("_k."), QStringLiteral("."));
    return name;
}

} // namespace

CtfAppletTestModule::CtfAppletTestModule() = default;
CtfAppletTestModule::~CtfAppletTestModule() = default;

QString CtfAppletTestModule::Type()
{
    return QStringLiteral("ctfapplet");
}

QString CtfAppletTestModule::TestType()
{
    return Type();
}

QString CtfAppletTestModule::ModuleXMLName()
{
    return QStringLiteral("ctfappletmodule.xml");
}

unsigned int CtfAppletTestModule::KestoID()
{
    return FirstAppletId();
}

QString CtfAppletTestModule::ModuleName()
{
    return HexModuleName();
}

bool CtfAppletTestModule::ProcessModuleMIF(const QString &)
{
    return false;
}

bool CtfAppletTestModule::Run(IKestoDevice *device, const QMap<QString, QString> &)
{
    const unsigned int classId = KestoID();
    if (classId == 0 || !device)
        return false;
    if (!InstallTest(device))
        return false;
    if (device->StartApplet(classId, QString()) != 0) {
        LogMessage(QStringLiteral("CtfAppletTestModule::Run error: ") + DeviceErrorText(device->lastError), false);
        return false;
    }
    return WaitWhileRunning([&] { return device->IsAppletRunning(classId); }, true);
}

bool CtfAppletTestModule::GetLogFilePaths(IKestoDevice *device, QStringList &paths)
{
    if (applets.isEmpty() || !device)
        return false;
    QString directory;
    if (device->FindModule(FirstAppletId(), directory) != 0)
        directory = QStringLiteral("fs:/usermods/%1").arg(moduleName.toLower());
    QSharedPointer<_DirectoryInfo> listing;
    if (device->ListDirectory(directory, listing) != 0 || !listing)
        return false;
    bool found = false;
    for (auto it = listing->FirstFile(); it != listing->LastFile(); ++it) {
        if (it->fileName.toLower().endsWith(QLatin1String(".log"))) {
            paths.append(it->fileName);
            found = true;
        }
    }
    return found;
}

bool CtfAppletTestModule::IsLogComplete(IKestoDevice *device)
{
    QStringList paths;
    if (!GetLogFilePaths(device, paths))
        return false;
    return WaitForLogMarker(device, paths.first(), "[/VERBOSE]", logger, WaitProgress::None);
}

bool CtfAppletTestModule::ParseLog(const QString &hostPath, TestResults &results)
{
    return ParseCtfLog(hostPath, results, moduleName, true);
}

bool CtfAppletTestModule::CopyLog(IKestoDevice *device, QMap<QString, QString> &env)
{
    desktopLogFiles.clear();
    QStringList paths;
    if (!GetLogFilePaths(device, paths))
        return false;
    return CopyLogFiles(device, paths, env.value(QStringLiteral("LogPath")), AppletHostName, false);
}

void CtfAppletTestModule::PostProcess(QMap<QString, QString> &env)
{
    const QString runId = env.value(QStringLiteral("TestRunID"));
    for (const QString &path : std::as_const(desktopLogFiles))
        StampLog(path, runId);
}

void CtfAppletTestModule::StampLog(const QString &hostPath, const QString &runId)
{
    StampTextLog(hostPath, runId, StampAnchor::FirstTestLine);
}
