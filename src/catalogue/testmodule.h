#pragma once

#include "catalogue/compilervariant.h"
#include "catalogue/testcase.h"
#include "common/export.h"
#include "device/device.h"
#include "catalogue/testresults.h"
#include "resources/mif.h"

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

    void SetLogger(Log *logger);
    void LogMessage(const QString &text, bool flag);

    QString IDHash();
    void SetSource(const QString &source);
    QString Source();
    void SetRunOption(const QString &option);
    void SetTestCases(const QStringList &testCases);
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
    virtual bool IsLogComplete(IKestoDevice *device) = 0;
    // Parses the copied logs in order and stops at the first one recognised;
    // false when none is.
    virtual bool ParseLog(TestResults &results);
    virtual bool ParseLog(const QString &hostPath, TestResults &results) = 0;
    // Copies the handset logs into env["LogPath"] under time-stamped names and
    // records them in desktopLogFiles; true when at least one was copied.
    virtual bool CopyLog(IKestoDevice *device, QMap<QString, QString> &env);
    virtual void PostProcess(QMap<QString, QString> &env) = 0;
    // Reads run-time facts from the module's package directory while a kit
    // is scanned.
    virtual bool ProcessPackage(const QString &directory);
    virtual QString ModuleName() = 0;
    virtual QString ModuleXMLName() = 0;
    // Reads a module description file of the kit. On failure the reason is in
    // errorText.
    virtual bool ProcessModuleXML(const QString &path);
    virtual bool ProcessModuleMIF(const QString &path) = 0;
    // Reads the module's manifest entry; true when it names the module.
    virtual bool ReadFromManifest(const QDomElement &element);
    // Writes the module's manifest entry (recomputing the ID hash first).
    virtual void WriteToManifest(QDomElement &element);

    bool selectable = true;
    Log *logger = nullptr;
    QString idHash;
    QString source;
    QString moduleName;
    QString family;
    QString subFamily;
    QString errorText;
    QString minKestoVersion;
    QString runOption;
    QVector<unsigned int> classids;
    QVector<Applet> applets;
    QStringList desktopLogFiles;
    QString baseLineFile;
    QString sourcePath;
    QString deviceDirectory;
    QList<TestCase> testCases;
    QStringList selectedTestCases;
    QMap<QString, QSharedPointer<_CompilerVariant>> targets;
    QStringList secondaryModules;

protected:
    // Where the header lines go when a copied log is stamped.
    enum class StampAnchor {
        FirstTestLine,    // before the first line beginning "Test:"
        LastModuleVerLine, // before the last line beginning "ModuleVer:"
        SecondLine,       // after the first line
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
                      QString (*rename)(const QString &fileName, const QString &moduleName),
                      bool nameFileOnly);

    // "0X" + KestoID() as 8 lower-case hexadecimal digits.
    QString HexModuleName();
    // The module's first applet class ID, 0 without applets.
    unsigned int FirstAppletId() const;

private:
    virtual unsigned int KestoID() = 0;

public:
    // The same entry as a light tree, as the catalogue cache is written and
    // read. Declared after every other virtual operation, so that theirs
    // keep their places in the table.
    virtual void WriteToManifest(XmlNode &element);
    virtual bool ReadFromManifest(const XmlNode &element);
};
