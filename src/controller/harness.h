#pragma once

#include "../common/export.h"
#include "../device/device.h"
#include "../environment/platforms.h"

#include <QList>
#include <QMap>
#include <QSharedPointer>
#include <QString>
#include <QStringList>

class Log;
class Manifest;
class ModuleSource;
class RunObserver;
struct TestResults;
class ProcessedResults;
class _Framework;
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
    // Ends what Initialize() started; no Harness may be used afterwards.
    static void Uninitialize();
    // Fill the list (cleared first) and return the number of entries.
    static unsigned int ListTargets(QList<ConnectTarget> &targets);
    // The installed platforms (KESTIX_PLATFORMS_ALL).
    static unsigned int ListPlatforms(QList<Platform> &platforms);
    // The installed test kits (KESTIX_TESTSETS_ALL).
    static unsigned int ListTestKits(QList<TestKit> &kits);

    // ---- Configuration ----

    // The message sink; not owned, null silences every message.
    void SetLogger(Log *logger);
    // Writes message to the log, and to the console when echo is set.
    void LogMessage(const QString &message, bool echo);

    // When set, modules stay installed on the handset after the run.
    void SetNoDelete(bool noDelete);
    // Told about every module the run loop takes (Run() and Run(source)),
    // with the verdicts recorded for it in this run; not owned, null for
    // none.
    void SetRunObserver(RunObserver *observer);
    // Milliseconds a module may take from its start until its log is
    // complete; past it the module is no longer waited for, is removed from
    // the handset (unless SetNoDelete) and ends as TimedOut. 0 (the default)
    // leaves only the log wait's own ten-minute limit.
    void SetModuleTimeLimit(qint64 ms);
    // The run option handed to every module the run starts.
    void SetRunOption(const QString &option);
    // Milliseconds paused before copying a module's logs; text that is not an
    // unsigned 32-bit decimal number stores 0.
    void SetCopyDelay(const QString &delay);
    // Ignored when family is empty.
    void SetFamily(const QString &family, const QString &variant);
    // A test kit path, part of a kit name, "*" for the default kit. Ignored
    // when empty or unchanged; a change drops the kit catalogue.
    void SetTestkit(const QString &testkit);
    // The test kit: the setting, or the kit that set-up chose.
    QString GetTestkit() const;
    // A platform path, part of a platform name, "*" for the default platform.
    // Ignored when empty or unchanged; a change drops the platform catalogue.
    void SetPlatform(const QString &platform);
    // The platform: the setting, or the platform that set-up chose.
    QString GetPlatform() const;
    // Host folder for copied logs; overrides the per-handset default.
    void SetLogOutputPath(const QString &path);
    // The processed-results file to record verdicts in; overrides the
    // per-handset default (and, for Process, the file below the log folder).
    void SetProcessedResultsPath(const QString &path);
    // The processed-results file in use: the one set, else the handset's
    // once connected, else the one Process chose below the log folder;
    // empty before any of these.
    QString GetProcessedResultsPath() const;
    // Restricts the next module the run starts to these test cases (the list
    // is then dropped); empty runs every test case.
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
    // The handset name as given to SetTarget.
    QString GetTarget() const;
    // True when at least one handset is reachable.
    bool IsTargetAvailable();
    // Connects to the first listed handset whose name or description contains
    // name (any letter case; an empty name uses the stored target, and an
    // empty target takes the first handset that connects). True at once
    // while connected. Failures are logged.
    bool ConnectToTarget(const QString &name);
    // Connects to that handset; true at once while connected.
    bool ConnectToTarget(const ConnectTarget &target);
    // Closes the handset connection, if any.
    void DisconnectTarget();
    // The name of the connected handset; empty while disconnected.
    QString ConnectedTarget() const;
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

    // ---- Test selection and catalogues ----

    // Appends the modules of the kit catalogue (when the kit was selected)
    // and then of the platform catalogue that match the filters: name
    // patterns with "*" wild cards at either end, or else a family and
    // sub-family contained in the module's. The list is not cleared. Returns
    // its count; set-up failures add nothing.
    unsigned int GetTestModules(QList<QSharedPointer<_TestModule>> &modules, const QStringList &names,
                                const QString &family, const QString &subFamily);
    // Clears the list and fills it with the modules named by the "testModule"
    // attributes of the "feature" elements of a feature list file. A missing
    // or malformed file, a file without features and unknown names are
    // logged. Returns the count.
    unsigned int GetTestModules(QList<QSharedPointer<_TestModule>> &modules, const QString &featureFile);
    // Scans the kit and the platform again and writes their catalogues to
    // outputPath (each to its own cache when outputPath is empty); a file
    // that cannot be opened is written to the home folder under the same
    // name instead. True when at least one catalogue was written.
    bool GenerateManifest(const QString &outputPath);

    // ---- Running ----

    // Queues a module for the next run; null is ignored.
    void AddTest(QSharedPointer<_TestModule> module);
    // Runs every queued module, sorted by test type and then by name: loads
    // each framework, starts the module, waits for its log, copies it,
    // removes the module, post-processes and records the verdicts. False
    // when nothing was queued, set-up or the connection failed, or the
    // handset was lost during the run.
    bool Run();
    // Runs the modules that source hands out one at a time, as Run() runs
    // its queue: set-up and connection first, each module's framework loaded
    // when needed, and every framework the run loaded unloaded at the end
    // (or as soon as another test type comes, unless the source keeps
    // frameworks). The queued tests are not touched. False when set-up or
    // the connection failed, or the handset was lost during the run (the
    // source was told Interrupted for the module then in hand).
    bool Run(ModuleSource &source);
    // Sorts modules into run order: by test type, then by name.
    static void SortForRun(QList<QSharedPointer<_TestModule>> &modules);
    // Installs the module's secondary modules and starts the module; false
    // when it could not be started.
    bool Run(QSharedPointer<_TestModule> module);
    // Runs the kit module of that name (any letter case); false when none.
    bool Run(const QString &name);
    // After set-up, this Harness's own catalogue module of that name (any
    // letter case) from the kit ("KVK") or platform ("PVS") catalogue; null
    // when there is none.
    QSharedPointer<_TestModule> FindTestModule(const QString &name, const QString &source);
    // Makes sure the framework is on the handset; false with a message when
    // it cannot be loaded.
    bool Load(QSharedPointer<_Framework> framework);
    // Loads the kit framework of exactly that name; false when none.
    bool Load(const QString &name);
    // Removes the framework from the handset; false without a connection.
    bool Unload(QSharedPointer<_Framework> framework);
    // Removes every framework of the kit catalogue; true when one was.
    bool Unload();
    // The kit framework of that name (any letter case); null when none.
    QSharedPointer<_Framework> GetFramework(const QString &name);
    // Replaces the list by the kit catalogue's frameworks; returns the count.
    unsigned int ListFrameworks(QList<QSharedPointer<_Framework>> &frameworks);

    // ---- Reprocessing saved logs ----

    // Records every log found below the log folder (sub-folders too, but not
    // "oatRawLogs" and "ProcessedResults") in one processed-results file,
    // without a handset. depth indents the messages; the host passes 0.
    // False when set-up fails or there is no log folder.
    bool Process(int depth);
    // Fills paths (cleared first) with the handset paths of the module's
    // logs, connecting first; returns the count.
    unsigned int GetLogFilePaths(QSharedPointer<_TestModule> module, QStringList &paths);

private:
    friend class HarnessTestAccess;
    friend class HarnessControllerAccess;
    class ResultsSession;

    // Resolves test kit and platform and fills the run keys of the
    // environment map; false when no test kit can be found.
    bool SetupEnvironment();
    // Reads (or generates) the catalogues that the settings call for; true
    // when one of them is usable.
    bool SetupManifest();
    // Manifest::GenerateManifest; a scan whose cache cannot be written still
    // counts when it found modules. Failures are logged under path.
    bool GenerateCatalogue(Manifest &catalogue, bool force, const QString &path);
    // SetupEnvironment and then SetupManifest.
    bool Setup();

    // Parses the module's logs and records the verdicts in the
    // processed-results file.
    void UpdateProcessedModulesXML(QSharedPointer<_TestModule> module);
    // The same; parsed receives the verdicts recorded. False when no log
    // was recognised.
    bool RecordVerdicts(QSharedPointer<_TestModule> module, TestResults &parsed);
    // Sets "ProcessedResultsPath" below "LogPath" + "/" + folder when absent.
    void EnsureProcessedResultsPath(const QString &folder);
    // The run loop over the modules of source, once set up and connected.
    bool RunModules(ModuleSource &source);
    // The log wait of the run loop; false when the handset was lost.
    bool WaitForLog(QSharedPointer<_TestModule> module);
    // True, with the run loop's message, when the handset has gone away: a
    // run that loses it at any step ends there with false.
    bool ConnectionDied();
    // Writes one generated catalogue to outputPath (or its home-folder
    // fall-back, or its cache when outputPath is empty); true when written.
    bool WriteGeneratedManifest(Manifest &manifest, const QString &setting, const QString &outputPath,
                                const QString &fallbackName);

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
    // The processed-results document held in memory while Run or Process
    // works; null otherwise.
    QSharedPointer<ProcessedResults> m_results;
    // Process writes the held document once at the end; Run after every
    // module.
    bool m_deferResultsSave = false;
    RunObserver *m_observer = nullptr;
    qint64 m_moduleTimeLimitMs = 0;
};
