#pragma once

#include "../catalogue/testmodule.h"
#include "../common/export.h"

// A unit test applet that runs under its own class ID and writes a text log
// and an XML log into the "log" folder of its handset directory.
class HARNESS_EXPORT UTTestModule : public _TestModule
{
public:
    UTTestModule();
    ~UTTestModule() override;

    // The kind's type word, "uitf", as TestType() answers and manifests write it.
    static QString Type();

    QString TestType() override;
    // Installs the module, pushes the configuration naming the selected test
    // cases, starts the applet and waits until it has stopped. False without
    // applets, when installing or starting fails, or on the poll limit.
    bool Run(IKestoDevice *device, const QMap<QString, QString> &env) override;
    // The ".txt" and ".xml" files of the module's handset "log" folder; both
    // are listed only when there are at least two.
    bool GetLogFilePaths(IKestoDevice *device, QStringList &paths) override;
    // Waits for "</TestRunLog>" in the XML log and "Elapsed Time:" in the
    // text log; false when they have not come after ten minutes.
    bool IsLogComplete(IKestoDevice *device) override;
    using _TestModule::ParseLog;
    // Parses a copied ".txt" log; true when it names its suite.
    bool ParseLog(const QString &hostPath, TestResults &results) override;
    // Stamps the copied text logs with header lines and the XML logs with
    // attributes on their root element.
    void PostProcess(QMap<QString, QString> &env) override;
    // "0X" and the first applet's class ID.
    QString ModuleName() override;
    QString ModuleXMLName() override;
    bool ProcessModuleMIF(const QString &path) override;

private:
    unsigned int KestoID() override;
    void SetupConfigData(IKestoDevice *device);
    void StampLogTXT(const QString &hostPath, const QString &runId);
    void StampLogXML(const QString &hostPath, const QString &runId);
};
