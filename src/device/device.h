#pragma once

#include "common/export.h"

#include <QList>
#include <QSharedPointer>
#include <QString>

class Log;

// One reachable handset: its name (which also names the handset's host
// folders) and a descriptive text.
struct HARNESS_EXPORT ConnectTarget
{
    ConnectTarget() = default;
    ConnectTarget(const QString &name, const QString &description)
        : name(name), description(description) {}

    QString name;
    QString description;
};

// One file of a handset directory listing; fileName is its full handset path
// ("fs:/usermods/x/a.log").
struct HARNESS_EXPORT _FileInfo
{
    QString fileName;
    qint64 size = 0;
};

// A handset directory listing.
class HARNESS_EXPORT _DirectoryInfo
{
public:
    using const_iterator = QList<_FileInfo>::const_iterator;

    QString directory;
    QList<_FileInfo> files;

    const_iterator FirstFile() const { return files.cbegin(); }
    const_iterator LastFile() const { return files.cend(); }
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

    explicit IKestoDevice(const ConnectTarget &target) : m_target(target) {}
    virtual ~IKestoDevice() = default;
    IKestoDevice(const IKestoDevice &) = delete;
    IKestoDevice &operator=(const IKestoDevice &) = delete;

    const ConnectTarget &GetConnectTarget() const { return m_target; }

    // Removes the installed module that provides classId; 0 on success.
    unsigned int DeleteDirectory(unsigned int classId);

    // "unknown", "arm", "win32"; manifests store these texts.
    static QString TargetToString(Platform platform);
    // The inverse of TargetToString, ignoring case; also accepts the decimal
    // value. Anything else is PLATFORM_UNKNOWN.
    static Platform StringToTarget(const QString &text);

    virtual unsigned int GetPlatformVersion(QString &version) = 0;
    virtual unsigned int StartProgram(const QString &program, const QString &arguments) = 0;
    virtual bool IsProgramRunning(const QString &program) = 0;
    virtual unsigned int StartApplet(unsigned int classId, const QString &arguments) = 0;
    virtual bool IsAppletRunning(unsigned int classId) = 0;
    virtual unsigned int ListDirectory(const QString &directory,
                                       QSharedPointer<_DirectoryInfo> &info) = 0;
    virtual unsigned int RemoveDirectory(const QString &directory) = 0;
    virtual unsigned int DeleteFile(const QString &path) = 0;
    virtual unsigned int InstallPackage(const QString &hostPath) = 0;
    virtual unsigned int CopyFileToDevice(const QString &hostPath, const QString &devicePath) = 0;
    virtual unsigned int CopyFileFromDevice(const QString &devicePath, const QString &hostPath) = 0;
    virtual unsigned int FindModule(unsigned int classId, QString &directory) = 0;
    virtual bool FileExists(const QString &path) = 0;
    virtual bool CopyOnDevice(const QString &source, const QString &destination) = 0;

    Platform platform = PLATFORM_UNKNOWN;
    unsigned int lastError = 0;
    bool connectionLost = false;

private:
    ConnectTarget m_target;
};
