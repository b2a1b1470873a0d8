#pragma once

#include "../common/export.h"
#include "../device/device.h"

#include <QList>
#include <QString>
#include <QVector>

class Log;

// Result numbers of the emulated handset's operations (also left in
// lastError). They are stable: users see them in run logs.
enum EmulatedHandsetError : unsigned int {
    HANDSET_OK = 0,
    // The handset folder vanished or holds a file named "offline".
    HANDSET_ERROR_CONNECTION_LOST = 1,
    // Not a handset path ("fs:/..."), or one that leaves the handset.
    HANDSET_ERROR_BAD_PATH = 2,
    // No such file, directory, module or program.
    HANDSET_ERROR_NOT_FOUND = 3,
    // A host file could not be read, written or removed.
    HANDSET_ERROR_IO = 4,
    // The package cannot be read or holds a member that may not be installed.
    HANDSET_ERROR_BAD_PACKAGE = 5,
    // A module's behaviour script could not be started.
    HANDSET_ERROR_START_FAILED = 6,
};

// A handset emulated in a host folder (one subfolder of the handsets folder,
// see ConnectFactory):
//   <handset>/handset.ini   description, platform and version; optionally
//                           "offlineAfter" (see IsReachable)
//   <handset>/fs/...        the handset's file system, "fs:/..." paths
//   <handset>/offline       when present the handset is unreachable
//   <handset>/behaviour.log output of the last behaviour script
//
// Installed modules live below "fs:/usermods/": every ".mif" file in a
// subfolder of it describes the module whose handset directory is that
// subfolder ("fs:/usermods/<dir>/"), with the class IDs, applets and program
// records it lists. "fs:/~0x%08x" (the class ID in lower-case hexadecimal)
// names the directory of the module providing that class ID in every
// operation.
//
// Starting a program or an applet runs the module's "behaviour" script, when
// it has one, with sh (as "sh behaviour program NAME ARGS" or
// "sh behaviour applet 0x%08x ARGS", ARGS split on blanks) in the fs folder
// with HANDSET_FS and HANDSET_MODULE_DIR set, and returns once it has ended;
// a script still running after the behaviour timeout (real time, 60 s by
// default: a real child process cannot be hurried by the library clock) is
// killed together with the processes it started. Nothing therefore runs once
// a start call has returned.
//
// Each operation first checks that the handset is still there; once it is
// gone connectionLost is set for good and every operation fails with
// HANDSET_ERROR_CONNECTION_LOST. A successful operation sets lastError to 0,
// a failing one to its result number.
class HARNESS_EXPORT EmulatedHandset : public IKestoDevice
{
public:
    // Opens the handset in folder, reading its handset.ini: the platform
    // kind from key "platform" (StringToTarget; PLATFORM_WIN32 when the key
    // is missing or empty) and the version text from key "version". Check
    // IsReachable before use.
    EmulatedHandset(const ConnectTarget &target, const QString &folder);
    ~EmulatedHandset() override;

    // Real time a behaviour script may run unless SetBehaviourTimeout says otherwise.
    static constexpr int kDefaultBehaviourTimeoutMs = 60000;

    // The settings file of the handset in folder.
    static QString SettingsPath(const QString &folder);

    // The handset's host folder.
    const QString &Folder() const { return m_folder; }
    // True while the folder exists and holds no "offline" file; sets
    // connectionLost (for good) otherwise. Every operation and the check made
    // on connecting call it. With handset.ini key "offlineAfter" = N the
    // handset answers N operations after the connection check and then drops
    // out as if unplugged: it writes its "offline" file and fails from the
    // next operation on (a fault to rehearse a handset lost at any step).
    bool IsReachable();
    // Where refusals that a result number cannot explain are reported (a
    // damaged package); none when null. The log must outlive the handset.
    void SetLogger(Log *log) { m_log = log; }
    // Real time a behaviour script may run before it is killed.
    void SetBehaviourTimeout(int milliseconds) { m_behaviourTimeoutMs = milliseconds; }

    // The "version" key of handset.ini.
    unsigned int GetPlatformVersion(QString &version) override;
    // Runs the behaviour of the installed module holding a program record
    // keyed program; HANDSET_ERROR_NOT_FOUND when no module has one.
    unsigned int StartProgram(const QString &program, const QString &arguments) override;
    // Always false: a start call returns once its behaviour has ended.
    bool IsProgramRunning(const QString &program) override;
    // Runs the behaviour of the installed module providing classId.
    unsigned int StartApplet(unsigned int classId, const QString &arguments) override;
    // Always false, as IsProgramRunning.
    bool IsAppletRunning(unsigned int classId) override;
    // Lists the plain files (no links, no folders) of a directory, sorted by
    // name; each entry's fileName is its full handset path. On failure info
    // holds an empty listing.
    unsigned int ListDirectory(const QString &directory, QSharedPointer<_DirectoryInfo> &info) override;
    // Removes a directory and everything below it.
    unsigned int RemoveDirectory(const QString &directory) override;
    // Removes a file of the handset.
    unsigned int DeleteFile(const QString &path) override;
    // Writes every regular member of a tar package below "fs:/usermods/"
    // (directory members become folders; links and other special members are
    // skipped; a hard link is written as a copy of the file it links to). A
    // damaged archive (with its reason in the log), a package with an
    // absolute member name, a ".." segment or a member that would land
    // outside the handset, and a package without any regular member, is
    // refused as a whole
    // (HANDSET_ERROR_BAD_PACKAGE) before anything is written; a write that
    // fails (HANDSET_ERROR_IO) takes back the files and folders the package
    // had created (files it replaced keep their new content).
    unsigned int InstallPackage(const QString &hostPath) override;
    // Copies a host file to the handset, creating the folders on the way and
    // replacing the destination once the copy is complete.
    unsigned int CopyFileToDevice(const QString &hostPath, const QString &devicePath) override;
    // Copies a handset file to the host, creating the host folder when
    // missing and replacing the destination once the copy is complete.
    unsigned int CopyFileFromDevice(const QString &devicePath, const QString &hostPath) override;
    // The directory ("fs:/usermods/<dir>/") of the installed module that
    // lists classId as a class or an applet; directory is emptied on failure.
    unsigned int FindModule(unsigned int classId, QString &directory) override;
    // True when a file or folder exists at the path.
    bool FileExists(const QString &path) override;
    // True when source was copied to destination.
    bool CopyOnDevice(const QString &source, const QString &destination) override;

private:
    struct Module
    {
        QString directory; // "fs:/usermods/<dir>/"
        QString hostDirectory;
        QVector<unsigned int> classIds;
        QStringList programs;
    };

    unsigned int Fail(unsigned int error);
    unsigned int Succeed();
    // The host path of a handset path, "fs:/~0x%08x" resolved; empty when refused
    // (error tells why).
    QString ToHost(const QString &handsetPath, unsigned int &error);
    // Checks the connection and maps the path; on failure records the error
    // in lastError and returns an empty path.
    QString Open(const QString &handsetPath);
    bool CheckNothingRuns();
    QList<Module> InstalledModules() const;
    bool FindModuleByClass(unsigned int classId, Module &module) const;
    unsigned int RunBehaviour(const Module &module, const QStringList &arguments);
    unsigned int CopyHostFile(const QString &source, const QString &destination);

    QString m_folder;
    QString m_version;
    Log *m_log = nullptr;
    int m_behaviourTimeoutMs = kDefaultBehaviourTimeoutMs;
    // "offlineAfter"; negative when the handset never drops out by itself.
    qint64 m_offlineAfter = -1;
    qint64 m_checks = 0;
};
