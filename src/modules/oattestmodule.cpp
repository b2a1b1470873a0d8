#include "modules/oattestmodule.h"

#include "common/clock.h"
#include "common/xmlnode.h"
#include "environment/testdirectories.h"
#include "modules/moduleutil.h"
#include "modules/oatframework.h"
#include "modules/programs.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QProcess>

using namespace ModuleUtil;

namespace {

constexpr unsigned int kProgramType = 0x01010100;
constexpr qint64 kInstallPauseMs = 1000;
constexpr qint64 kPerlLimitMs = 30000;
constexpr int kPerlSliceMs = 100;
constexpr qint64 kNoOutputPauseMs = 1000;

const QString kLogFolder = QStringLiteral("fs:/shared/pek/log/");

QString Unchanged(const QString &fileName, const QString &)
{
    return fileName;
}

// The path as given when absolute, else resolved against the current folder,
// so that it keeps naming the same place inside the script's own folder.
QString Absolute(const QString &path)
{
    return QDir::isAbsolutePath(path) ? path : QDir::cleanPath(QDir::current().absoluteFilePath(path));
}

QString OatResult(const QString &status)
{
    if (status == QLatin1String("success"))
        return QStringLiteral("pass");
    if (status == QLatin1String("failed"))
        return QStringLiteral("fail");
    if (status == QLatin1String("unsupported"))
        return QStringLiteral("unsupported");
    return QStringLiteral("unexecuted");
}

QString WithoutMarks(QString text)
{
    return text.remove(QLatin1Char('@')).remove(QLatin1Char('#'));
}

} // namespace

OatTestModule::OatTestModule() = default;
OatTestModule::~OatTestModule() = default;

QString OatTestModule::Type()
{
    return QStringLiteral("oat");
}

QString OatTestModule::TestType()
{
    return Type();
}

QString OatTestModule::ModuleXMLName()
{
    return QStringLiteral("oatmodule.xml");
}

unsigned int OatTestModule::KestoID()
{
    return _OatFramework::kClassId;
}

bool OatTestModule::ProcessModuleMIF(const QString &)
{
    return false;
}

QString OatTestModule::ModuleName()
{
    return Programs::PropertyText(GetProgram(), "Program Name");
}

SysResource OatTestModule::GetProgram()
{
    return programs.isEmpty() ? SysResource() : programs.first();
}

QString OatTestModule::HandsetDirectoryName() const
{
    const QString name
        = StartsWithNoCase(moduleName, QStringLiteral("oat")) ? moduleName : QStringLiteral("oat") + moduleName;
    return name.toLower();
}

QString OatTestModule::MifFileName() const
{
    return mifname.isEmpty() ? HandsetDirectoryName() + QStringLiteral(".mif") : mifname;
}

QString OatTestModule::LogBasePath() const
{
    const QString name = StartsWithNoCase(moduleName, QStringLiteral("oat")) ? moduleName.mid(3) : moduleName;
    return kLogFolder + name.toLower();
}

QString OatTestModule::SetupConfigData(const QMap<QString, QString> &)
{
    QString mode = QStringLiteral(" -ra ");
    if (!runOption.isEmpty()) {
        const QString option = runOption.toLower();
        if (option == QLatin1String("auto") || option == QLatin1String("automated"))
            mode = QStringLiteral(" -ru ");
        else if (option == QLatin1String("interactive") || option == QLatin1String("inter"))
            mode = QStringLiteral(" -ri ");
        else if (option != QLatin1String("all"))
            LogMessage(QStringLiteral("OatTestModule::Unknown Run Option") + option, false);
        runOption.clear();
    }

    const QString program = Programs::PropertyText(GetProgram(), "Program Name");
    if (program.isEmpty())
        return QString();
    QString cases;
    if (!selectedTestCases.isEmpty()) {
        mode = QStringLiteral(" -rs ");
        cases = QLatin1Char(',') + selectedTestCases.join(QLatin1Char(','));
    }
    return QStringLiteral("-d") + QStringLiteral("k") + mode + program + cases;
}

void OatTestModule::ExecuteMifHack(IKestoDevice *device)
{
    const QString mif = MifFileName();
    device->CopyOnDevice(QStringLiteral("fs:/usermods/") + HandsetDirectoryName() + QLatin1Char('/') + mif,
                         QStringLiteral("fs:/mif/") + mif);
}

bool OatTestModule::Run(IKestoDevice *device, const QMap<QString, QString> &env)
{
    const QString arguments = SetupConfigData(env);
    if (arguments.isEmpty() || !device)
        return false;
    if (!InstallTest(device))
        return false;
    Clock::Sleep(kInstallPauseMs);
    ExecuteMifHack(device);
    if (device->StartApplet(_OatFramework::kClassId, arguments) != 0) {
        LogMessage(QStringLiteral("OatTestModule::Run error: ") + DeviceErrorText(device->lastError), false);
        return false;
    }
    return WaitWhileRunning([device] { return device->IsAppletRunning(_OatFramework::kClassId); }, false);
}

bool OatTestModule::GetLogFilePaths(IKestoDevice *device, QStringList &paths)
{
    paths.clear();
    if (!device)
        return false;
    const QString base = LogBasePath();
    for (const char *suffix : {"_u.oat", ".oat", "_k.oat"}) {
        const QString path = base + QLatin1String(suffix);
        if (device->FileExists(path)) {
            paths.append(path);
            break;
        }
    }
    return !paths.isEmpty();
}

bool OatTestModule::IsLogComplete(IKestoDevice *device)
{
    QStringList paths;
    if (!GetLogFilePaths(device, paths))
        return false;
    return WaitForLogMarker(device, paths.first(), "RESULT:", logger, WaitProgress::DotsAndDashes);
}

bool OatTestModule::ParseLog(const QString &hostPath, TestResults &results)
{
    StartParse(results);
    if (!EndsWithNoCase(hostPath, QStringLiteral(".oat")))
        return false;

    QString testCase;
    QString result;
    const auto setManifest = [&](const QString &name) {
        results.manifestName = name;
        if (moduleName.isEmpty())
            moduleName = name;
    };
    const bool opened = ForEachLogLine(hostPath, [&](const QString &line) {
        if (line.startsWith(QLatin1Char('@'))) {
            const qsizetype colon = line.indexOf(QLatin1Char(':'));
            if (colon >= 0) {
                if (!testCase.isEmpty() && result.isEmpty()) {
                    results.caseResults.append(TestCaseResult(testCase, QStringLiteral("unexecuted")));
                    testCase.clear();
                    result.clear();
                }
                testCase = WithoutMarks(line.section(QLatin1Char(':'), 1, 1).trimmed());
            } else if (results.manifestName.isEmpty()) {
                setManifest(WithoutMarks(line.trimmed()));
            }
        } else if (StartsWithNoCase(line, QStringLiteral("Status:"))) {
            result = OatResult(line.section(QLatin1Char(':'), 1, 1).trimmed().toLower());
        } else if (StartsWithNoCase(line, QStringLiteral("Manifest Name:"))) {
            setManifest(PrefixValue(line, QStringLiteral("Manifest Name:")));
        } else if (StartsWithNoCase(line, QStringLiteral("ID Hash:"))) {
            results.idHash = PrefixValue(line, QStringLiteral("ID Hash:"));
        } else if (StartsWithNoCase(line, QStringLiteral("TimeStamp:"))) {
            const QDateTime time = QDateTime::fromString(PrefixValue(line, QStringLiteral("TimeStamp:")),
                                                         QStringLiteral("HH:mm:ss MM-dd-yyyy"));
            if (time.isValid())
                results.timeStamp = time;
        } else if (line.contains(QLatin1String("RESULT:"), Qt::CaseInsensitive)) {
            results.complete = true;
        }
        RecordPair(results, testCase, result);
    });
    if (!opened)
        return false;
    return !results.manifestName.isEmpty();
}

bool OatTestModule::CopyLog(IKestoDevice *device, QMap<QString, QString> &env)
{
    const QString rawDirectory
        = QDir::cleanPath(env.value(QStringLiteral("LogPath")) + QStringLiteral("/") + QStringLiteral("oatRawLogs"));
    desktopLogFiles.clear();
    if (!QDir().mkpath(rawDirectory))
        LogMessage(QStringLiteral("   Folder %1 cannot be created\n").arg(rawDirectory), true);
    if (!env.contains(QStringLiteral("OatRawLogPath")))
        env.insert(QStringLiteral("OatRawLogPath"), rawDirectory);
    QStringList paths;
    if (!GetLogFilePaths(device, paths))
        return false;
    return CopyLogFiles(device, paths, rawDirectory, Unchanged, true);
}

bool OatTestModule::RemoveTest(IKestoDevice *device)
{
    const bool removed = _TestModule::RemoveTest(device);
    if (!device)
        return removed;
    QStringList paths;
    if (GetLogFilePaths(device, paths)) {
        for (const QString &path : std::as_const(paths))
            device->DeleteFile(path);
    }
    device->DeleteFile(QStringLiteral("fs:/mif/") + MifFileName());
    return removed;
}

void OatTestModule::StampLog(const QString &hostPath, const QString &runId)
{
    StampTextLog(hostPath, runId, StampAnchor::LastModuleVerLine);
}

void OatTestModule::PostProcess(QMap<QString, QString> &env)
{
    const QString runId = env.value(QStringLiteral("TestRunID"));
    for (const QString &path : std::as_const(desktopLogFiles))
        StampLog(path, runId);

    const QString perlCache = env.value(QStringLiteral("PerlCache"));
    const QString script = perlCache + QStringLiteral("/PostProcess3.pl");
    if (!QFile::exists(script))
        return;
    LogMessage(QStringLiteral("   Post Processing Oat"), true);
    LogMessage(QStringLiteral("   Device Pack:") + env.value(QStringLiteral("DevicePack")), true);

    const QString perl = FindAssociatedExecutable(script);
    if (perl.isEmpty()) {
        LogMessage(QStringLiteral(" Post Processing Failed.  A Perl Instance can not be found."), true);
        return;
    }

    // The script runs in its own folder, so every path handed to it is made
    // absolute first.
    QString sourceDirectory = env.value(QStringLiteral("OatRawLogPath"));
    if (sourceDirectory.isEmpty()) {
        LogMessage(QStringLiteral("OatTestModule::PostProcess missing oat source log directory"), true);
        return;
    }
    sourceDirectory = Absolute(sourceDirectory);
    QDir().mkpath(sourceDirectory);

    const QString cleanSource = QDir::cleanPath(sourceDirectory);
    const qsizetype slash = cleanSource.lastIndexOf(QLatin1Char('/'));
    const QString tempDirectory = cleanSource.left(slash) + QStringLiteral("/tempPPLogs");
    QDir().mkpath(tempDirectory);
    const auto stop = [&](const char *message) {
        LogMessage(QLatin1String(message), true);
        QDir().rmdir(tempDirectory);
    };

    QString destination = env.value(QStringLiteral("LogPath"));
    if (destination.isEmpty())
        return stop("OatTestModule::PostProcess missing destination log directory");
    destination = Absolute(destination);
    QString devicePack = env.value(QStringLiteral("DSOCacheFilePath"));
    if (devicePack.isEmpty())
        return stop("OatTestModule::PostProcess missing devicePack file.");
    devicePack = Absolute(devicePack);
    QString platform = env.value(QStringLiteral("Platform"));
    if (platform.isEmpty())
        return stop("OatTestModule::PostProcess missing platform directory.");
    platform = Absolute(platform);

    QProcess process;
    process.setProcessChannelMode(QProcess::MergedChannels);
    process.setWorkingDirectory(perlCache);
    process.start(perl, {script, sourceDirectory, tempDirectory, devicePack, platform});
    QByteArray output;
    if (process.waitForStarted()) {
        const Clock::Timer timer;
        while (!process.waitForFinished(kPerlSliceMs) && process.state() != QProcess::NotRunning
               && timer.Elapsed() < kPerlLimitMs)
            output += process.readAll();
        output += process.readAll();
        if (process.state() != QProcess::NotRunning) {
            process.kill();
            process.waitForFinished();
        }
    } else {
        LogMessage(QStringLiteral("OatTestModule::PostProcess cannot start %1\n").arg(perl), true);
    }
    if (!output.isEmpty())
        LogMessage(QString::fromLocal8Bit(output), true);

    LogMessage(QStringLiteral("   Copying temporary post process files to log directory."), true);
    desktopLogFiles.clear();
    const QStringList names = QDir(tempDirectory).entryList(QDir::Files | QDir::Hidden, QDir::Unsorted);
    for (const QString &name : names) {
        const QString from = tempDirectory + QLatin1Char('/') + name;
        const QString to = destination + QLatin1Char('/') + name;
        if (QFile::exists(to))
            QFile::remove(to);
        if (!QFile::copy(from, to)) {
            LogMessage(QStringLiteral("   Log %1 not copied to %2\n").arg(from, to), true);
            continue;
        }
        desktopLogFiles.append(to);
        QFile::remove(from);
    }
    if (names.isEmpty())
        Clock::Sleep(kNoOutputPauseMs);
    QDir().rmdir(tempDirectory);
}

bool OatTestModule::ProcessPackage(const QString &directory)
{
    Programs::ReadFromPackage(directory, moduleName, QStringLiteral("oat"), kProgramType, programs, &mifname);
    return false;
}

bool OatTestModule::ReadFromManifest(const XmlNode &element)
{
    _TestModule::ReadFromManifest(element);
    mifname = element.Attribute(QStringLiteral("mifname"));
    return Programs::ReadFromManifest(element, programs) > 0;
}

void OatTestModule::WriteToManifest(XmlNode &element)
{
    _TestModule::WriteToManifest(element);
    element.SetAttribute(QStringLiteral("mifname"), mifname);
    Programs::WriteToManifest(element, programs);
}
