#pragma once

#include "../catalogue/testmodule.h"
#include "../common/export.h"

// A supporting module that other modules need on the handset while they run.
// It is only installed and removed, never run or parsed, and never offered
// for selection.
class HARNESS_EXPORT SecondaryModule : public _TestModule
{
public:
    SecondaryModule();
    ~SecondaryModule() override;

    // The kind's type word, "secondary", as TestType() answers and manifests write it.
    static QString Type();

    QString TestType() override;
    bool Run(IKestoDevice *device, const QMap<QString, QString> &env) override;
    bool GetLogFilePaths(IKestoDevice *device, QStringList &paths) override;
    bool IsLogComplete(IKestoDevice *device) override;
    using _TestModule::ParseLog;
    bool ParseLog(const QString &hostPath, TestResults &results) override;
    void PostProcess(QMap<QString, QString> &env) override;
    QString ModuleName() override;
    QString ModuleXMLName() override;
    bool ProcessModuleMIF(const QString &path) override;
    // Reads the base entry; always false. The DOM form reads through this.
    using _TestModule::ReadFromManifest;
    bool ReadFromManifest(const XmlNode &element) override;

private:
    unsigned int KestoID() override;
};
