#pragma once

#include "common/export.h"
#include "device/device.h"
#include "environment/platforms.h"

#include <QList>
#include <QMap>
#include <QSharedPointer>
#include <QString>
#include <QStringList>

class Log;
class Manifest;
class _TestModule;

// Drives test runs against one handset: holds the run configuration, the
// environment map handed to every framework and module, the kit and platform
// catalogues, the queued modules and the connection to the handset.
//
// Use: Harness::Initialize() once per process; construct; SetLogger; the
// configuration setters; target selection; run; destroy; Harness::Uninitialize().
// A Harness is used from one thread and cannot be copied: it owns its
// catalogues and its handset connection.
class HARNESS_EXPORT Harness
{
public:
    Harness();
    // Deletes both catalogues and closes a connection the host left open.
    ~Harness();
    Harness(const Harness &) = delete;
    Harness &operator=(const Harness &) = delete;

    // Process-wide start and stop of the device library; they bracket all use
    // of every Harness.
    static bool Initialize();
    static void Uninitialize();
    // Fill the list (cleared first) and return the number of entries.
    static unsigned int ListTargets(QList<ConnectTarget> &targets);
    static unsigned int ListPlatforms(QList<Platform> &platforms);
    static unsigned int ListTestKits(QList<TestKit> &kits);

    // ---- Configuration ----

    // The message sink; not owned, null silences every message.
    void SetLogger(Log *logger);
    void LogMessage(const QString &message, bool echo);

    // When set, modules stay installed on the handset after the run.
    void SetNoDelete(bool noDelete);
    void SetRunOption(const QString &option);
    // Milliseconds paused before copying a module's logs; text that is not an
    // unsigned 32-bit decimal number stores 0.
    void SetCopyDelay(const QString &delay);
    // Ignored when family is empty.
    void SetFamily(const QString &family, const QString &variant);
    // A test kit path, part of a kit name, "*" for the default kit. Ignored
    // when empty or unchanged; a change drops the kit catalogue.
    void SetTestkit(const QString &testkit);
    QString GetTestkit() const;
    // A platform path, part of a platform name, "*" for the default platform.
    // Ignored when empty or unchanged; a change drops the platform catalogue.
    void SetPlatform(const QString &platform);
    QString GetPlatform() const;
    // Host folder for copied logs; overrides the per-handset default.
    void SetLogOutputPath(const QString &path);
    void SetTestCases(const QStringList &testCases);

    // Takes a device pack: compiles it (once per source file and change) with
    // AltCompileResource and flattens it for the OAT modules. A path that is
    // not a file is logged and ignored.
    void SetDPK(const QString &path);
    // Takes a test data resource source: compiles it (once per source file
    // and change) with CompileResource. A path that is not a file is logged
    // and ignored.
    void SetTestData(const QString &path);

    // ---- Target handset ----

    // Selects the handset by full or partial name. A new name drops an open
    // connection, so the next operation connects to the new handset.
    void SetTarget(const QString &name);
    // True when at least one handset is reachable.
    bool IsTargetAvailable();
    // Connects to the first listed handset whose name or description contains
    // name (any letter case; an empty name uses the stored target, and an
    // empty target takes the first handset that connects). True at once
    // while connected. Failures are logged.
    bool ConnectToTarget(const QString &name);
    bool ConnectToTarget(const ConnectTarget &target);
    void DisconnectTarget();
    // Copies a handset file to the host, connecting first; true on success.
    bool CopyFileFromDevice(const QString &handsetPath, const QString &hostPath);
    // The per-handset log folder of the connected handset, connecting first;
    // empty when no connection can be made.
    QString GetDefaultLogFilePath();

    // ---- Resource compilation (SDK tools under KESTIX_TOOLSET) ----

    // Compiles a resource source with kestormc; a ".ksx" source is converted
    // to a ".car" file first, which is removed afterwards. True when the
    // compiler reported success.
    bool CompileResource(const QString &source, const QString &output);
    // Compiles a device pack with the older kestorc. True when the compiler
    // ran and left a non-empty output file; otherwise logs the command and
    // the compiler's output.
    bool AltCompileResource(const QString &source, const QString &output);

private:
    friend class HarnessTestAccess;

    // Resolves test kit and platform and fills the run keys of the
    // environment map; false when no test kit can be found.
    bool SetupEnvironment();

    // Stores a non-empty, changed kit or platform setting under key and
    // clears the environment-ready flag; false when nothing changed.
    bool ChangeSetting(const QString &key, const QString &value);

    // Makes cacheFile a compiled copy of source unless it is already newer
    // than source; a failed compile leaves no cache file behind.
    bool RefreshCache(const QString &source, const QString &cacheFile,
                      bool (Harness::*compile)(const QString &, const QString &));

    Log *m_logger = nullptr;
    QSharedPointer<Manifest> m_kitManifest;
    QSharedPointer<Manifest> m_platformManifest;
    IKestoDevice *m_device = nullptr;
    QList<QSharedPointer<_TestModule>> m_tests;
    QMap<QString, QString> m_environment;
    // The kit was taken as the default only to support the platform; its
    // modules are not offered for selection.
    bool m_kitNotSelected = false;
    bool m_noDelete = false;
    quint32 m_copyDelay = 0;
    bool m_environmentReady = false;
    QString m_family;
    QString m_familyVariant;
    QString m_target;
    QString m_runOption;
    QStringList m_testCases;
    // The kit path that set-up chose as a default only for the platform;
    // keeps the kit unselected when set-up runs again with that kit.
    QString m_defaultOnlyKit;
};
