#include "handset/emulatedhandset.h"

#include "archive/tar.h"
#include "common/handsetpath.h"
#include "log/log.h"
#include "resources/kestoresources.h"
#include "resources/sysresource.h"

#include <QDir>
#include <QDirIterator>
#include <QFile>
#include <QFileInfo>
#include <QProcess>
#include <QProcessEnvironment>
#include <QRegularExpression>
#include <QSaveFile>
#include <QSettings>

#include <algorithm>
#include <signal.h>
#include <unistd.h>

namespace {

constexpr char kUserModules[] = "fs:/usermods/";
constexpr char kBehaviourFile[] = "behaviour";
constexpr char kBehaviourLog[] = "behaviour.log";
// Module information files are small; anything larger is not one.
constexpr qint64 kMaxMifSize = 16 * 1024 * 1024;
constexpr qint64 kCopyChunk = 64 * 1024;
constexpr int kKillWaitMs = 5000;

// Creates folder and its missing parents, remembering (outermost first)
// every folder it created.
bool MakePath(const QString &folder, QStringList &created)
{
    QStringList missing;
    QString path = QDir::cleanPath(folder);
    while (!QFileInfo::exists(path)) {
        missing.prepend(path);
        const QString parent = QFileInfo(path).absolutePath();
        if (parent == path)
            return false;
        path = parent;
    }
    if (!QFileInfo(path).isDir())
        return false;
    for (const QString &level : missing) {
        if (!QDir().mkdir(level))
            return false;
        created.append(level);
    }
    return true;
}

void KillProcessGroup(qint64 pid)
{
    if (pid > 0)
        ::kill(-pid_t(pid), SIGKILL);
}

} // namespace

EmulatedHandset::EmulatedHandset(const ConnectTarget &target, const QString &folder)
    : IKestoDevice(target), m_folder(QDir::cleanPath(QDir(folder).absolutePath()))
{
    const QSettings settings(SettingsPath(m_folder), QSettings::IniFormat);
    const QString kind = settings.value(QStringLiteral("platform")).toString();
    platform = kind.trimmed().isEmpty() ? PLATFORM_WIN32 : StringToTarget(kind);
    m_version = settings.value(QStringLiteral("version")).toString();
    bool ok = false;
    const qint64 offlineAfter = settings.value(QStringLiteral("offlineAfter")).toString().toLongLong(&ok);
    if (ok && offlineAfter >= 0)
        m_offlineAfter = offlineAfter;
}

EmulatedHandset::~EmulatedHandset() = default;

QString EmulatedHandset::SettingsPath(const QString &folder)
{
    return folder + QStringLiteral("/handset.ini");
}

bool EmulatedHandset::IsReachable()
{
    if (connectionLost)
        return false;
    // The first check is the one made on connecting.
    if (m_offlineAfter >= 0 && m_checks++ > m_offlineAfter) {
        QFile offline(m_folder + QStringLiteral("/offline"));
        if (offline.open(QIODevice::WriteOnly))
            offline.close();
        connectionLost = true;
        return false;
    }
    if (!QFileInfo(m_folder).isDir() || QFileInfo::exists(m_folder + QStringLiteral("/offline")))
        connectionLost = true;
    return !connectionLost;
}

unsigned int EmulatedHandset::Fail(unsigned int error)
{
    lastError = error;
    return error;
}

unsigned int EmulatedHandset::Succeed()
{
    lastError = HANDSET_OK;
    return HANDSET_OK;
}

QString EmulatedHandset::ToHost(const QString &handsetPath, unsigned int &error)
{
    QString path = HandsetPath::Clean(handsetPath);
    if (path.isEmpty()) {
        error = HANDSET_ERROR_BAD_PATH;
        return QString();
    }
    // Compiled once, inside the guarded initialisation: handsets run from
    // several threads at once then only read it.
    static const QRegularExpression alias = [] {
        QRegularExpression expression(QStringLiteral("^fs:/~0x([0-9a-fA-F]{8})(?:/(.*))?$"));
        expression.optimize();
        return expression;
    }();
    const QRegularExpressionMatch match = alias.match(path);
    if (match.hasMatch()) {
        Module module;
        if (!FindModuleByClass(match.captured(1).toUInt(nullptr, 16), module)) {
            error = HANDSET_ERROR_NOT_FOUND;
            return QString();
        }
        path = module.directory + match.captured(2);
    }
    const QString host = HandsetPath::ToHost(m_folder, path);
    if (host.isEmpty())
        error = HANDSET_ERROR_BAD_PATH;
    return host;
}

QString EmulatedHandset::Open(const QString &handsetPath)
{
    if (!IsReachable()) {
        Fail(HANDSET_ERROR_CONNECTION_LOST);
        return QString();
    }
    unsigned int error = HANDSET_OK;
    const QString host = ToHost(handsetPath, error);
    if (host.isEmpty())
        Fail(error);
    return host;
}

QList<EmulatedHandset::Module> EmulatedHandset::InstalledModules() const
{
    QList<Module> modules;
    const QString root = HandsetPath::ToHost(m_folder, QLatin1String(kUserModules));
    if (root.isEmpty() || !QFileInfo(root).isDir())
        return modules;

    // Links are not followed: a module is what was installed below usermods.
    QStringList mifs;
    QDirIterator it(root, QDir::Files | QDir::Hidden | QDir::NoSymLinks, QDirIterator::Subdirectories);
    while (it.hasNext()) {
        const QString path = it.next();
        // A module information file directly in usermods names no module
        // folder of its own; taking usermods as its folder would let
        // removing that module remove every module.
        if (path.endsWith(QLatin1String(".mif"), Qt::CaseInsensitive) && QFileInfo(path).absolutePath() != root)
            mifs.append(path);
    }
    std::sort(mifs.begin(), mifs.end());

    for (const QString &path : mifs) {
        QFile file(path);
        if (file.size() > kMaxMifSize || !file.open(QIODevice::ReadOnly))
            continue;
        KestoResources resources;
        if (!resources.LoadFrom(file.readAll()))
            continue;
        Module module;
        module.hostDirectory = QFileInfo(path).absolutePath();
        module.directory = HandsetPath::FromHost(m_folder, module.hostDirectory) + QLatin1Char('/');
        QVector<unsigned int> classes;
        if (resources.GetMifClasses(classes))
            module.classIds += classes;
        QVector<Applet> applets;
        if (resources.GetMifApplets(applets)) {
            for (const Applet &applet : applets)
                module.classIds.append(applet.appletid);
        }
        QVector<quint16> ids;
        resources.GetIDs(KestoResources::kTypeSysResource, ids);
        for (quint16 id : ids) {
            SysResource record;
            if (!resources.GetSysResource(id, record) || !record.IsProgram())
                continue;
            const QString key = record.Property("Key").toString();
            if (!key.isEmpty())
                module.programs.append(key);
        }
        modules.append(module);
    }
    return modules;
}

bool EmulatedHandset::FindModuleByClass(unsigned int classId, Module &module) const
{
    if (classId == 0)
        return false;
    const QList<Module> modules = InstalledModules();
    for (const Module &candidate : modules) {
        if (candidate.classIds.contains(classId)) {
            module = candidate;
            return true;
        }
    }
    return false;
}

unsigned int EmulatedHandset::RunBehaviour(const Module &module, const QStringList &arguments)
{
    // Mapped like any handset path, so that a link cannot make sh read a
    // host file outside the handset.
    const QString script = HandsetPath::ToHost(m_folder, module.directory + QLatin1String(kBehaviourFile));
    if (script.isEmpty())
        return Fail(HANDSET_ERROR_BAD_PATH);
    if (!QFileInfo(script).isFile())
        return Succeed(); // a module without a behaviour ends at once

    const QString fs = HandsetPath::FsFolder(m_folder);
    if (!QDir().mkpath(fs))
        return Fail(HANDSET_ERROR_IO);
    QProcessEnvironment environment = QProcessEnvironment::systemEnvironment();
    environment.insert(QStringLiteral("HANDSET_FS"), fs);
    environment.insert(QStringLiteral("HANDSET_MODULE_DIR"), module.hostDirectory);

    QProcess process;
    process.setProgram(QStringLiteral("sh"));
    process.setArguments(QStringList{script} + arguments);
    process.setWorkingDirectory(fs);
    process.setProcessEnvironment(environment);
    process.setStandardInputFile(QProcess::nullDevice());
    process.setProcessChannelMode(QProcess::MergedChannels);
    process.setStandardOutputFile(m_folder + QLatin1Char('/') + QLatin1String(kBehaviourLog));
    // Its own process group, so that a timeout ends whatever it started too.
    process.setChildProcessModifier([] { ::setpgid(0, 0); });
    process.start();
    if (!process.waitForStarted())
        return Fail(HANDSET_ERROR_START_FAILED);
    const qint64 pid = process.processId();
    if (!process.waitForFinished(m_behaviourTimeoutMs)) {
        KillProcessGroup(pid);
        process.kill();
        process.waitForFinished(kKillWaitMs);
    }
    // Whatever the script left running in the background ends with it.
    KillProcessGroup(pid);
    return Succeed();
}

bool EmulatedHandset::CheckNothingRuns()
{
    // Start calls return only once their behaviour has ended.
    if (IsReachable())
        Succeed();
    else
        Fail(HANDSET_ERROR_CONNECTION_LOST);
    return false;
}

unsigned int EmulatedHandset::GetPlatformVersion(QString &version)
{
    if (!IsReachable())
        return Fail(HANDSET_ERROR_CONNECTION_LOST);
    version = m_version;
    return Succeed();
}

unsigned int EmulatedHandset::StartProgram(const QString &program, const QString &arguments)
{
    if (!IsReachable())
        return Fail(HANDSET_ERROR_CONNECTION_LOST);
    const QList<Module> modules = InstalledModules();
    for (const Module &module : modules) {
        if (module.programs.contains(program)) {
            return RunBehaviour(module,
                                QStringList{QStringLiteral("program"), program}
                                    + arguments.split(QLatin1Char(' '), Qt::SkipEmptyParts));
        }
    }
    return Fail(HANDSET_ERROR_NOT_FOUND);
}

bool EmulatedHandset::IsProgramRunning(const QString &)
{
    return CheckNothingRuns();
}

unsigned int EmulatedHandset::StartApplet(unsigned int classId, const QString &arguments)
{
    if (!IsReachable())
        return Fail(HANDSET_ERROR_CONNECTION_LOST);
    Module module;
    if (!FindModuleByClass(classId, module))
        return Fail(HANDSET_ERROR_NOT_FOUND);
    return RunBehaviour(
        module,
        QStringList{QStringLiteral("applet"), QStringLiteral("0x%1").arg(classId, 8, 16, QLatin1Char('0'))}
            + arguments.split(QLatin1Char(' '), Qt::SkipEmptyParts));
}

bool EmulatedHandset::IsAppletRunning(unsigned int)
{
    return CheckNothingRuns();
}

unsigned int EmulatedHandset::ListDirectory(const QString &directory, QSharedPointer<_DirectoryInfo> &info)
{
    info.reset(new _DirectoryInfo);
    info->directory = directory;
    const QString host = Open(directory);
    if (host.isEmpty())
        return lastError;
    if (!QFileInfo(host).isDir())
        return Fail(HANDSET_ERROR_NOT_FOUND);
    const QFileInfoList entries
        = QDir(host).entryInfoList(QDir::Files | QDir::Hidden | QDir::NoSymLinks, QDir::Name | QDir::IgnoreCase);
    for (const QFileInfo &entry : entries) {
        _FileInfo file;
        file.fileName = HandsetPath::FromHost(m_folder, entry.filePath());
        file.size = entry.size();
        info->files.append(file);
    }
    return Succeed();
}

unsigned int EmulatedHandset::RemoveDirectory(const QString &directory)
{
    const QString host = Open(directory);
    if (host.isEmpty())
        return lastError;
    const QFileInfo info(host);
    if (!info.isDir() || info.isSymLink())
        return Fail(HANDSET_ERROR_NOT_FOUND);
    if (!QDir(host).removeRecursively())
        return Fail(HANDSET_ERROR_IO);
    return Succeed();
}

unsigned int EmulatedHandset::DeleteFile(const QString &path)
{
    const QString host = Open(path);
    if (host.isEmpty())
        return lastError;
    if (!QFileInfo(host).isFile())
        return Fail(HANDSET_ERROR_NOT_FOUND);
    if (!QFile::remove(host))
        return Fail(HANDSET_ERROR_IO);
    return Succeed();
}

unsigned int EmulatedHandset::InstallPackage(const QString &hostPath)
{
    if (!IsReachable())
        return Fail(HANDSET_ERROR_CONNECTION_LOST);
    if (!QFileInfo(hostPath).isFile())
        return Fail(HANDSET_ERROR_NOT_FOUND);
    Tar tar;
    if (!tar.Open(QIODevice::ReadOnly, hostPath))
        return Fail(HANDSET_ERROR_IO);
    if (tar.IsDamaged()) {
        if (m_log)
            m_log->LogMessage(QStringLiteral("EmulatedHandset::InstallPackage refused %1: %2\n")
                                  .arg(QDir::toNativeSeparators(hostPath), tar.ErrorString()),
                              true);
        return Fail(HANDSET_ERROR_BAD_PACKAGE);
    }

    // Check every member before writing any.
    struct Planned
    {
        TarFileEntry entry;
        QString host;
    };
    QList<Planned> plan;
    bool haveFile = false;
    for (unsigned int i = 0; i < tar.EntryCount(); ++i) {
        const TarFileEntry entry = tar.Entry(i);
        if (entry.name.isEmpty())
            break; // the zero blocks that end the archive
        const bool isFile = entry.IsFile();
        if (!isFile && !entry.IsDirectory())
            continue; // links, devices and the like are not installed
        if (entry.name.startsWith(QLatin1Char('/')))
            return Fail(HANDSET_ERROR_BAD_PACKAGE);
        QStringList segments;
        for (const QString &segment : entry.name.split(QLatin1Char('/'), Qt::SkipEmptyParts)) {
            if (segment == QLatin1String(".."))
                return Fail(HANDSET_ERROR_BAD_PACKAGE);
            if (segment != QLatin1String("."))
                segments.append(segment);
        }
        if (segments.isEmpty()) {
            if (isFile)
                return Fail(HANDSET_ERROR_BAD_PACKAGE);
            continue; // "./" names the package root
        }
        const QString host
            = HandsetPath::ToHost(m_folder, QLatin1String(kUserModules) + segments.join(QLatin1Char('/')));
        if (host.isEmpty())
            return Fail(HANDSET_ERROR_BAD_PACKAGE);
        haveFile = haveFile || isFile;
        plan.append(Planned{entry, host});
    }
    if (!haveFile)
        return Fail(HANDSET_ERROR_BAD_PACKAGE);

    QStringList createdFolders;
    QStringList createdFiles;
    bool ok = true;
    for (Planned &item : plan) {
        const bool isFile = item.entry.IsFile();
        if (!MakePath(isFile ? QFileInfo(item.host).absolutePath() : item.host, createdFolders)) {
            ok = false;
            break;
        }
        if (!isFile)
            continue;
        const QByteArray data = tar.EntryData(item.entry);
        const bool existed = QFileInfo::exists(item.host);
        QSaveFile file(item.host);
        if (data.size() != qint64(item.entry.size) || !file.open(QIODevice::WriteOnly)
            || file.write(data) != data.size() || !file.commit()) {
            ok = false;
            break;
        }
        if (!existed)
            createdFiles.append(item.host);
    }
    if (ok)
        return Succeed();
    for (const QString &file : createdFiles)
        QFile::remove(file);
    for (auto it = createdFolders.crbegin(); it != createdFolders.crend(); ++it)
        QDir().rmdir(*it);
    return Fail(HANDSET_ERROR_IO);
}

unsigned int EmulatedHandset::CopyHostFile(const QString &source, const QString &destination)
{
    QFile in(source);
    if (!QFileInfo(source).isFile())
        return HANDSET_ERROR_NOT_FOUND;
    if (!in.open(QIODevice::ReadOnly))
        return HANDSET_ERROR_IO;
    if (!QDir().mkpath(QFileInfo(destination).absolutePath()))
        return HANDSET_ERROR_IO;
    QSaveFile out(destination);
    if (!out.open(QIODevice::WriteOnly))
        return HANDSET_ERROR_IO;
    while (!in.atEnd()) {
        const QByteArray chunk = in.read(kCopyChunk);
        if (chunk.isEmpty() || out.write(chunk) != chunk.size()) {
            out.cancelWriting();
            return HANDSET_ERROR_IO;
        }
    }
    if (!out.commit())
        return HANDSET_ERROR_IO;
    return HANDSET_OK;
}

unsigned int EmulatedHandset::CopyFileToDevice(const QString &hostPath, const QString &devicePath)
{
    const QString host = Open(devicePath);
    if (host.isEmpty())
        return lastError;
    const unsigned int error = CopyHostFile(hostPath, host);
    return error == HANDSET_OK ? Succeed() : Fail(error);
}

unsigned int EmulatedHandset::CopyFileFromDevice(const QString &devicePath, const QString &hostPath)
{
    const QString host = Open(devicePath);
    if (host.isEmpty())
        return lastError;
    if (hostPath.isEmpty())
        return Fail(HANDSET_ERROR_NOT_FOUND);
    const unsigned int error = CopyHostFile(host, hostPath);
    return error == HANDSET_OK ? Succeed() : Fail(error);
}

unsigned int EmulatedHandset::FindModule(unsigned int classId, QString &directory)
{
    directory.clear();
    if (!IsReachable())
        return Fail(HANDSET_ERROR_CONNECTION_LOST);
    Module module;
    if (!FindModuleByClass(classId, module))
        return Fail(HANDSET_ERROR_NOT_FOUND);
    directory = module.directory;
    return Succeed();
}

bool EmulatedHandset::FileExists(const QString &path)
{
    const QString host = Open(path);
    if (host.isEmpty())
        return false;
    if (!QFileInfo::exists(host)) {
        Fail(HANDSET_ERROR_NOT_FOUND);
        return false;
    }
    Succeed();
    return true;
}

bool EmulatedHandset::CopyOnDevice(const QString &source, const QString &destination)
{
    const QString from = Open(source);
    const QString to = from.isEmpty() ? QString() : Open(destination);
    if (to.isEmpty())
        return false;
    const unsigned int error = CopyHostFile(from, to);
    if (error != HANDSET_OK) {
        Fail(error);
        return false;
    }
    Succeed();
    return true;
}
