#pragma once

#include "../common/export.h"

#include <QList>
#include <QSharedPointer>
#include <QString>

class Log;

// One reachable handset: its name (which also names the handset's host
// folders) and a descriptive text.
struct HARNESS_EXPORT ConnectTarget
{
    ConnectTarget() = default;
    // A handset of that name and descriptive text.
    ConnectTarget(const QString &name, const QString &description) : name(name), description(description) { }

    // The handset's name.
    QString name;
    // Text describing the handset, for people.
    QString description;
};

// One file of a handset directory listing; fileName is its full handset path
// ("fs:/usermods/x/a.log").
struct HARNESS_EXPORT _FileInfo
{
    // The file's full handset path.
    QString fileName;
    // Its size in bytes.
    qint64 size = 0;
};

// A handset directory listing.
class HARNESS_EXPORT _DirectoryInfo
{
public:
    // Walks the files of the listing.
    using const_iterator = QList<_FileInfo>::const_iterator;

    // The handset directory listed.
    QString directory;
    // Its plain files.
    QList<_FileInfo> files;

    // The range of the listed files, as begin() and end().
    const_iterator FirstFile() const { return files.cbegin(); }
    // See FirstFile().
    const_iterator LastFile() const { return files.cend(); }
    // True when the directory holds a file.
    bool HasFiles() const { return !files.isEmpty(); }
};

// An open connection to one handset. Results of 0 mean success; on failure an
// operation sets lastError. Once the handset is gone, connectionLost is set
// and every later operation fails.
class HARNESS_EXPORT IKestoDevice
{
public:
    // The handset's platform kind; the tool-chain "win32" builds for the
    // host simulator (2), the ARM tool-chains for handsets (1).
    enum Platform {
        PLATFORM_UNKNOWN = 0,
        PLATFORM_ARM = 1,
        PLATFORM_WIN32 = 2,
    };

    // A connection to the handset target; opened by ConnectFactory.
    explicit IKestoDevice(const ConnectTarget &target) : m_target(target) { }
    virtual ~IKestoDevice() = default;
    IKestoDevice(const IKestoDevice &) = delete;
    IKestoDevice &operator=(const IKestoDevice &) = delete;

    // The handset this connection reaches.
    const ConnectTarget &GetConnectTarget() const { return m_target; }

    // Removes the installed module that provides classId; 0 on success.
    unsigned int DeleteDirectory(unsigned int classId);

    // "unknown", "arm", "win32"; manifests store these texts.
    static QString TargetToString(Platform platform);
    // The inverse of TargetToString, ignoring case; also accepts the decimal
    // value. Anything else is PLATFORM_UNKNOWN.
    static Platform StringToTarget(const QString &text);

    // The handset's platform version text.
    virtual unsigned int GetPlatformVersion(QString &version) = 0;
    // Starts the installed program of that name with arguments.
    virtual unsigned int StartProgram(const QString &program, const QString &arguments) = 0;
    // True while the program runs.
    virtual bool IsProgramRunning(const QString &program) = 0;
    // Starts the installed applet of that class ID with arguments.
    virtual unsigned int StartApplet(unsigned int classId, const QString &arguments) = 0;
    // True while the applet runs.
    virtual bool IsAppletRunning(unsigned int classId) = 0;
    // Lists the files of a handset directory into info.
    virtual unsigned int ListDirectory(const QString &directory, QSharedPointer<_DirectoryInfo> &info) = 0;
    // Removes a handset directory and what it holds.
    virtual unsigned int RemoveDirectory(const QString &directory) = 0;
    // Removes a handset file.
    virtual unsigned int DeleteFile(const QString &path) = 0;
    // Installs the package archive at hostPath on the handset.
    virtual unsigned int InstallPackage(const QString &hostPath) = 0;
    // Copies a host file to the handset.
    virtual unsigned int CopyFileToDevice(const QString &hostPath, const QString &devicePath) = 0;
    // Copies a handset file to the host.
    virtual unsigned int CopyFileFromDevice(const QString &devicePath, const QString &hostPath) = 0;
    // The handset directory of the installed module providing classId.
    virtual unsigned int FindModule(unsigned int classId, QString &directory) = 0;
    // True when the handset path exists.
    virtual bool FileExists(const QString &path) = 0;
    // Copies a handset file to another handset path; true on success.
    virtual bool CopyOnDevice(const QString &source, const QString &destination) = 0;

    // The handset's platform kind.
    Platform platform = PLATFORM_UNKNOWN;
    // The result of the last failing operation (0 after a success).
    unsigned int lastError = 0;
    // Set for good once the handset has gone away.
    bool connectionLost = false;

private:
    ConnectTarget m_target;
};
