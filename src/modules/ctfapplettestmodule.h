#pragma once

#include "../catalogue/testmodule.h"
#include "../common/export.h"

// A CTF test that runs as an applet under its own class ID and writes
// CTF-format ".log" files into its handset directory.
class HARNESS_EXPORT CtfAppletTestModule : public _TestModule
{
public:
    CtfAppletTestModule();
    ~CtfAppletTestModule() override;

    // The kind's type word, "ctfapplet", as TestType() answers and manifests write it.
    static QString Type();

    QString TestType() override;
    // Installs the module, starts its applet and waits until it has stopped.
    // False without applets, when installing or starting fails, or when the
    // applet is still running after the poll limit.
    bool Run(IKestoDevice *device, const QMap<QString, QString> &env) override;
    // The ".log" files of the module's handset directory (any letter case).
    bool GetLogFilePaths(IKestoDevice *device, QStringList &paths) override;
    // Waits for "[/VERBOSE]" in the first log; false after ten minutes.
    bool IsLogComplete(IKestoDevice *device) override;
    using _TestModule::ParseLog;
    bool ParseLog(const QString &hostPath, TestResults &results) override;
    // The base copy, with a "_k." in a handset file name dropped to ".".
    bool CopyLog(IKestoDevice *device, QMap<QString, QString> &env) override;
    void PostProcess(QMap<QString, QString> &env) override;
    // "0X" and the first applet's class ID.
    QString ModuleName() override;
    QString ModuleXMLName() override;
    bool ProcessModuleMIF(const QString &path) override;

private:
    unsigned int KestoID() override;
    void StampLog(const QString &hostPath, const QString &runId);
};
