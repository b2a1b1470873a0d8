#pragma once

#include "../catalogue/testmodule.h"
#include "../common/export.h"
#include "../resources/sysresource.h"

#include <QList>

// A test suite run on the handset by the OAT framework applet. The applet
// writes one ".oat" log per suite under "fs:/shared/pek/log/"; after the run
// the copied logs are stamped and post-processed by an external Perl script.
class HARNESS_EXPORT OatTestModule : public _TestModule
{
public:
    OatTestModule();
    ~OatTestModule() override;

    // The kind's type word, "oat", as TestType() answers and manifests write it.
    static QString Type();

    QString TestType() override;
    // Installs the module, publishes its module information file and starts
    // the framework applet on the suite's program; waits until it stops.
    // False without a program, when installing or starting fails, or on the
    // poll limit.
    bool Run(IKestoDevice *device, const QMap<QString, QString> &env) override;
    // The base removal, then the handset logs and the published module
    // information file.
    bool RemoveTest(IKestoDevice *device) override;
    // The first present of <log base>_u.oat, .oat and _k.oat.
    bool GetLogFilePaths(IKestoDevice *device, QStringList &paths) override;
    // Waits for "RESULT:" in the log; false after ten minutes.
    bool IsLogComplete(IKestoDevice *device) override;
    using _TestModule::ParseLog;
    bool ParseLog(const QString &hostPath, TestResults &results) override;
    // Copies the log into the run's raw log folder (env["LogPath"] +
    // "/oatRawLogs"), recording it in env["OatRawLogPath"] when absent.
    bool CopyLog(IKestoDevice *device, QMap<QString, QString> &env) override;
    // Stamps the copied logs, then runs "PostProcess3.pl" from the Perl
    // script cache over the raw log folder and collects its output files
    // into the log folder.
    void PostProcess(QMap<QString, QString> &env) override;
    // Reads the module information file name and the program records from
    // the module's package; always false.
    bool ProcessPackage(const QString &directory) override;
    // The "Program Name" of the first program.
    QString ModuleName() override;
    QString ModuleXMLName() override;
    bool ProcessModuleMIF(const QString &path) override;
    // The base entry plus "mifname" and "programs"; true when at least one
    // program was read. The DOM forms read and write through these.
    using _TestModule::ReadFromManifest;
    using _TestModule::WriteToManifest;
    bool ReadFromManifest(const XmlNode &element) override;
    void WriteToManifest(XmlNode &element) override;

    // The module's handset directory name: the module name with an "oat"
    // prefix, lower-cased.
    QString HandsetDirectoryName() const;
    // mifname, or the handset directory name + ".mif".
    QString MifFileName() const;
    // "fs:/shared/pek/log/" + the module name without its "oat" prefix,
    // lower-cased.
    QString LogBasePath() const;

    // The module information file name from the package or manifest; empty when none (see MifFileName()).
    QString mifname;
    // The program records read from the package or the manifest; the first one is the module's program.
    QList<SysResource> programs;

private:
    unsigned int KestoID() override;
    SysResource GetProgram();
    QString SetupConfigData(const QMap<QString, QString> &env);
    void ExecuteMifHack(IKestoDevice *device);
    void StampLog(const QString &hostPath, const QString &runId);
};
