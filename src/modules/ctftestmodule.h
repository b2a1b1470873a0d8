#pragma once

#include "../catalogue/testmodule.h"
#include "../common/export.h"
#include "../resources/sysresource.h"

#include <QList>
#include <QStringList>

// A test program started by name on the handset; it writes one text log,
// "CTF.log", in "fs:/usermods/CTF/".
class HARNESS_EXPORT CtfTestModule : public _TestModule
{
public:
    CtfTestModule();
    ~CtfTestModule() override;

    // The kind's type word, "ctf", as TestType() answers and manifests write it.
    static QString Type();

    QString TestType() override;
    // Resets the handset log from the empty template, installs the module,
    // starts its program and waits until it has ended (true also when the
    // wait gives up). False when the module cannot be installed, has no
    // program or the program does not start.
    bool Run(IKestoDevice *device, const QMap<QString, QString> &env) override;
    // The base removal, then deletes the handset logs.
    bool RemoveTest(IKestoDevice *device) override;
    // "fs:/usermods/CTF/CTF.log" and "fs:/usermods/ctf/ctf.log" when present;
    // the first answer is kept for the life of the object.
    bool GetLogFilePaths(IKestoDevice *device, QStringList &paths) override;
    // Waits for "[/VERBOSE]" in the first log; false when it has not come
    // after ten minutes.
    bool IsLogComplete(IKestoDevice *device) override;
    using _TestModule::ParseLog;
    // Parses a copied ".log" file; true when it names its module.
    bool ParseLog(const QString &hostPath, TestResults &results) override;
    // Copies the logs as <module>-CTF-<time stamp>.log into env["LogPath"].
    bool CopyLog(IKestoDevice *device, QMap<QString, QString> &env) override;
    // Stamps every copied log with the run's identity.
    void PostProcess(QMap<QString, QString> &env) override;
    // Reads the program records from the module's package; always false.
    bool ProcessPackage(const QString &directory) override;
    // The handset name of the module's program.
    QString ModuleName() override;
    QString ModuleXMLName() override;
    bool ProcessModuleMIF(const QString &path) override;
    // The base entry plus "programs"; true when at least one program was read.
    // The DOM forms read and write through these.
    using _TestModule::ReadFromManifest;
    using _TestModule::WriteToManifest;
    bool ReadFromManifest(const XmlNode &element) override;
    void WriteToManifest(XmlNode &element) override;

    // The program records read from the package or the manifest; the program
    // run is the first whose "Key" contains the module name + "_k", else the first.
    QList<SysResource> programs;
    // The handset logs found by the first GetLogFilePaths that found any; empty until then.
    QStringList logPaths;

private:
    unsigned int KestoID() override;
    SysResource GetProgram();
    QString GetEmptyCTFLogCache(const QMap<QString, QString> &env);
    void StampLog(const QString &hostPath, const QString &runId);
};

// Parses a copied CTF-format log into results. The applet kind takes only
// the first word of a test name and drops a trailing "_k" from a suite name
// when the log names no manifest. moduleName is set from the log when empty.
HARNESS_EXPORT bool ParseCtfLog(const QString &hostPath, TestResults &results, QString &moduleName, bool appletRules);
