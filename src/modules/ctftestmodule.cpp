#include "modules/ctftestmodule.h"

#include "common/clock.h"
#include "modules/moduleutil.h"
#include "modules/programs.h"

#include <QDir>
#include <QFile>

using namespace ModuleUtil;

namespace {

constexpr unsigned int kProgramType = 0x0102FAF7;
constexpr qint64 kStartPauseMs = 500;
constexpr qint64 kRemovePauseMs = 500;

const QString kUpperLog = QStringLiteral("fs:/usermods/CTF/CTF.log");
const QString kLowerLog = QStringLiteral("fs:/usermods/ctf/ctf.log");

QString CtfHostName(const QString &fileName, const QString &moduleName)
{
    QString name = fileName;
    return name.replace(QStringLiteral("CTF"), moduleName + QStringLiteral("-CTF"));
}

} // namespace

bool ParseCtfLog(const QString &hostPath, TestResults &results, QString &moduleName, bool appletRules)
{
    StartParse(results);
    if (!EndsWithNoCase(hostPath, QStringLiteral(".log")))
        return false;

    QString testCase;
    QString result;
    bool namedManifest = false;
    const auto nameModule = [&]() {
        if (moduleName.isEmpty())
            moduleName = results.manifestName;
    };
    const bool opened = ForEachLogLine(hostPath, [&](const QString &line) {
        if (StartsWithNoCase(line, QStringLiteral("Test:"))) {
            testCase = PrefixValue(line, QStringLiteral("Test:"));
            if (appletRules)
                testCase = testCase.split(QLatin1Char(' '), Qt::SkipEmptyParts).value(0);
        } else if (StartsWithNoCase(line, QStringLiteral("Result:"))) {
            result = PrefixValue(line, QStringLiteral("Result:")).toLower();
        } else if (StartsWithNoCase(line, QStringLiteral("Suite:"))) {
            if (results.manifestName.isEmpty()) {
                results.manifestName = PrefixValue(line, QStringLiteral("Suite:"));
                nameModule();
            }
        } else if (StartsWithNoCase(line, QStringLiteral("Manifest Name:"))) {
            results.manifestName = PrefixValue(line, QStringLiteral("Manifest Name:"));
            namedManifest = true;
            nameModule();
        } else if (StartsWithNoCase(line, QStringLiteral("ID Hash:"))) {
            results.idHash = PrefixValue(line, QStringLiteral("ID Hash:"));
        } else if (StartsWithNoCase(line, QStringLiteral("Time:"))) {
            const QDateTime time = QDateTime::fromString(PrefixValue(line, QStringLiteral("Time:")),
                                                         QStringLiteral("yyyy/MM/dd HH:mm:ss"));
            if (time.isValid())
                results.timeStamp = time;
        } else if (line.contains(QStringLiteral("[/VERBOSE]"), Qt::CaseInsensitive)) {
            results.complete = true;
        }
        RecordPair(results, testCase, result);
    });
    if (!opened)
        return false;
    if (appletRules && !namedManifest && EndsWithNoCase(results.manifestName, QStringLiteral("_k")))
        results.manifestName.chop(2);
    return !results.manifestName.isEmpty();
}

CtfTestModule::CtfTestModule() = default;
CtfTestModule::~CtfTestModule() = default;

QString CtfTestModule::Type()
{
    return QStringLiteral("ctf");
}

QString CtfTestModule::TestType()
{
    return Type();
}

QString CtfTestModule::ModuleXMLName()
{
    return QStringLiteral("ctfmodule.xml");
}

unsigned int CtfTestModule::KestoID()
{
    return 1;
}

bool CtfTestModule::ProcessModuleMIF(const QString &)
{
    return false;
}

QString CtfTestModule::ModuleName()
{
    return Programs::PropertyText(GetProgram(), "Key");
}

SysResource CtfTestModule::GetProgram()
{
    SysResource chosen;
    const QString preferred = moduleName + QStringLiteral("_k");
    for (const SysResource &program : std::as_const(programs)) {
        if (chosen.type == 0)
            chosen = program;
        if (Programs::PropertyText(program, "Key").contains(preferred, Qt::CaseInsensitive)) {
            chosen = program;
            break;
        }
    }
    return chosen;
}

QString CtfTestModule::GetEmptyCTFLogCache(const QMap<QString, QString> &env)
{
    const QString directory = env.value(QStringLiteral("DataCachePath"));
    if (directory.isEmpty())
        return QString();
    const QString path = directory + QDir::separator() + QStringLiteral("CTF.log");
    if (!QFile::exists(path)) {
        QFile file(path);
        if (file.open(QIODevice::WriteOnly))
            file.close();
    }
    return path;
}

bool CtfTestModule::Run(IKestoDevice *device, const QMap<QString, QString> &env)
{
    if (!device)
        return false;
    const QString emptyLog = GetEmptyCTFLogCache(env);
    if (!emptyLog.isEmpty())
        device->CopyFileToDevice(emptyLog, kUpperLog);
    if (!InstallTest(device))
        return false;
    const SysResource program = GetProgram();
    if (program.type == 0)
        return false;
    const QString name = Programs::PropertyText(program, "Key");
    const QString arguments = Programs::PropertyText(program, "Arguments");
    Clock::Sleep(kStartPauseMs);
    if (device->StartProgram(name, arguments) != 0) {
        LogMessage(QStringLiteral("CtfTestModule::Run error: ") + name + QLatin1Char(' ')
                       + DeviceErrorText(device->lastError),
                   false);
        return false;
    }
    WaitWhileRunning([&] { return device->IsProgramRunning(name); }, true);
    return true;
}

bool CtfTestModule::GetLogFilePaths(IKestoDevice *device, QStringList &paths)
{
    if (!logPaths.isEmpty()) {
        paths = logPaths;
        return true;
    }
    if (!device)
        return false;
    for (const QString &path : {kUpperLog, kLowerLog}) {
        if (device->FileExists(path)) {
            logPaths.append(path);
            paths.append(path);
        }
    }
    return !logPaths.isEmpty();
}

bool CtfTestModule::IsLogComplete(IKestoDevice *device)
{
    QStringList paths;
    if (!GetLogFilePaths(device, paths))
        return false;
    return WaitForLogMarker(device, paths.first(), "[/VERBOSE]", logger, WaitProgress::Dots);
}

bool CtfTestModule::ParseLog(const QString &hostPath, TestResults &results)
{
    return ParseCtfLog(hostPath, results, moduleName, false);
}

bool CtfTestModule::CopyLog(IKestoDevice *device, QMap<QString, QString> &env)
{
    desktopLogFiles.clear();
    const QString directory = QDir::cleanPath(env.value(QStringLiteral("LogPath")));
    QStringList paths;
    if (!GetLogFilePaths(device, paths))
        return false;
    return CopyLogFiles(device, paths, directory, CtfHostName, false);
}

bool CtfTestModule::RemoveTest(IKestoDevice *device)
{
    const bool removed = _TestModule::RemoveTest(device);
    QStringList paths;
    if (device && GetLogFilePaths(device, paths)) {
        for (const QString &path : std::as_const(paths)) {
            if (device->DeleteFile(path) != 0)
                LogMessage(QStringLiteral("   CtfTestModule::RemoveTest error deleting log file %1\n").arg(path), true);
        }
        Clock::Sleep(kRemovePauseMs);
    }
    return removed;
}

void CtfTestModule::PostProcess(QMap<QString, QString> &env)
{
    const QString runId = env.value(QStringLiteral("TestRunID"));
    for (const QString &path : std::as_const(desktopLogFiles))
        StampLog(path, runId);
}

void CtfTestModule::StampLog(const QString &hostPath, const QString &runId)
{
    StampTextLog(hostPath, runId, StampAnchor::FirstTestLine);
}

bool CtfTestModule::ProcessPackage(const QString &directory)
{
    Programs::ReadFromPackage(directory, moduleName, QStringLiteral("ctf"), kProgramType, programs, nullptr);
    return false;
}

bool CtfTestModule::ReadFromManifest(const XmlNode &element)
{
    _TestModule::ReadFromManifest(element);
    return Programs::ReadFromManifest(element, programs) > 0;
}

void CtfTestModule::WriteToManifest(XmlNode &element)
{
    _TestModule::WriteToManifest(element);
    Programs::WriteToManifest(element, programs);
}
