#pragma once

#include "../common/export.h"
#include "../device/device.h"
#include "../resources/mif.h"
#include "compilervariant.h"
#include "testcase.h"
#include "testresults.h"

#include <QDomElement>
#include <QList>
#include <QMap>
#include <QSharedPointer>
#include <QString>
#include <QStringList>
#include <QVector>

class Log;
class XmlNode;

// The base of every test module kind. It holds the catalogue data of a module
// (read from its description XML or its manifest entry), the run-time state
// of the current run, and the behaviour that the kinds share: installing the
// module, removing it, copying its logs to the host under time-stamped names
// and stamping them with the run's identity.
class HARNESS_EXPORT _TestModule
{
public:
    _TestModule();
    virtual ~_TestModule();
    _TestModule(const _TestModule &) = delete;
    _TestModule &operator=(const _TestModule &) = delete;

    // The message sink (not owned; null silences).
    void SetLogger(Log *logger);
    // Writes text to the logger, echoed when flag is set.
    void LogMessage(const QString &text, bool flag);

    // The module's ID hash ("#" and its decimal value), as last computed or read.
    QString IDHash();
    // The catalogue the module comes from: "KVK" (test kit) or "PVS" (platform).
    void SetSource(const QString &source);
    // See SetSource().
    QString Source();
    // The run option of the next run.
    void SetRunOption(const QString &option);
    // The test cases the next run is limited to; empty runs all.
    void SetTestCases(const QStringList &testCases);
    // Records a host copy of one of the module's logs.
    void AddDesktopLogFile(const QString &path);

    // Among the targets built for platform (in name order): the first whose
    // build label contains "debug" (debug true) or "release" (debug false),
    // else the last of them; null when none is built for platform.
    QSharedPointer<_CompilerVariant> GetCompilerVariant(IKestoDevice::Platform platform, bool debug);

    // Installs the module's package for the handset's platform and records
    // the module's handset directory. False when no target fits the platform
    // or the handset refuses the package.
    bool InstallTest(IKestoDevice *device);

    // The kind's type word ("ctf", "ctfapplet", "oat", "uitf", "secondary").
    virtual QString TestType() = 0;
    // Installs and starts the test and waits until it has stopped.
    virtual bool Run(IKestoDevice *device, const QMap<QString, QString> &env) = 0;
    // Removes the module from the handset (by class ID, then by applet, then
    // by name) and the directories of its secondary modules. True only when
    // the module was removed by class ID or applet.
    virtual bool RemoveTest(IKestoDevice *device);
    // Fills paths with the handset paths of the module's logs.
    virtual bool GetLogFilePaths(IKestoDevice *device, QStringList &paths) = 0;
    // True once the module's log on the handset shows that the run has ended.
    virtual bool IsLogComplete(IKestoDevice *device) = 0;
    // Parses the copied logs in order and stops at the first one recognised;
    // false when none is.
    virtual bool ParseLog(TestResults &results);
    // Parses one copied log into results; false when it is not a log of this kind.
    virtual bool ParseLog(const QString &hostPath, TestResults &results) = 0;
    // Copies the handset logs into env["LogPath"] under time-stamped names and
    // records them in desktopLogFiles; true when at least one was copied.
    virtual bool CopyLog(IKestoDevice *device, QMap<QString, QString> &env);
    // Works on the copied logs before they are parsed (stamping them; OAT: its Perl script).
    virtual void PostProcess(QMap<QString, QString> &env) = 0;
    // Reads run-time facts from the module's package directory while a kit
    // is scanned.
    virtual bool ProcessPackage(const QString &directory);
    // The name the module is started by on the handset.
    virtual QString ModuleName() = 0;
    // The kind's description file name in a kit ("ctfmodule.xml", ...).
    virtual QString ModuleXMLName() = 0;
    // Reads a module description file of the kit. On failure the reason is in
    // errorText.
    virtual bool ProcessModuleXML(const QString &path);
    // Reads the class IDs and applets of a module-information file.
    virtual bool ProcessModuleMIF(const QString &path) = 0;
    // Reads the module's manifest entry; true when it names the module.
    virtual bool ReadFromManifest(const QDomElement &element);
    // Writes the module's manifest entry (recomputing the ID hash first).
    virtual void WriteToManifest(QDomElement &element);

    // False for modules that only come with others (secondary modules).
    bool selectable = true;
    // The message sink; not owned.
    Log *logger = nullptr;
    // The ID hash; see IDHash().
    QString idHash;
    // "KVK" or "PVS"; see SetSource().
    QString source;
    // The module's name in the catalogue.
    QString moduleName;
    // The family and sub-family the module belongs to.
    QString family;
    // See family.
    QString subFamily;
    // Why reading the description file failed.
    QString errorText;
    // The lowest platform version the module supports, as its description states it.
    QString minKestoVersion;
    // See SetRunOption().
    QString runOption;
    // The class IDs the module provides.
    QVector<unsigned int> classids;
    // The applets the module provides.
    QVector<Applet> applets;
    // The host copies of the module's logs from the last run.
    QStringList desktopLogFiles;
    // The kit's base-line file of an OAT module; empty for other kinds.
    QString baseLineFile;
    // The module's folder in the kit when it comes with its sources.
    QString sourcePath;
    // The module's handset directory once installed.
    QString deviceDirectory;
    // The test cases the module holds.
    QList<TestCase> testCases;
    // See SetTestCases().
    QStringList selectedTestCases;
    // The module's builds keyed by target name.
    QMap<QString, QSharedPointer<_CompilerVariant>> targets;
    // Names of the secondary modules installed with it.
    QStringList secondaryModules;

protected:
    // Where the header lines go when a copied log is stamped.
    enum class StampAnchor {
        FirstTestLine, // before the first line beginning "Test:"
        LastModuleVerLine, // before the last line beginning "ModuleVer:"
        SecondLine, // after the first line
    };

    // Inserts "GUID:", "Manifest Name:" and "ID Hash:" lines into a copied
    // text log. The log's bytes are kept as they are; an unreadable or
    // unwritable file is left untouched.
    void StampTextLog(const QString &hostPath, const QString &runId, StampAnchor anchor);

    // The copy loop shared by the kinds: each handset path's file name is
    // passed through rename, then every "." becomes the local time stamp
    // "-yyyy-MM-dd-hh-mm-ss."; the file lands in directory. Messages name
    // the handset path, or only its file name with nameFileOnly.
    bool CopyLogFiles(IKestoDevice *device, const QStringList &paths, const QString &directory,
                      QString (*rename)(const QString &fileName, const QString &moduleName), bool nameFileOnly);

    // "0X" + KestoID() as 8 lower-case hexadecimal digits.
    QString HexModuleName();
    // The module's first applet class ID, 0 without applets.
    unsigned int FirstAppletId() const;

private:
    virtual unsigned int KestoID() = 0;

public:
    // WriteToManifest and ReadFromManifest on the same entry as a light tree,
    // as the catalogue cache is written and read. Declared after every other
    // virtual operation, so that theirs keep their places in the table.
    virtual void WriteToManifest(XmlNode &element);
    // See WriteToManifest(XmlNode &).
    virtual bool ReadFromManifest(const XmlNode &element);
};
