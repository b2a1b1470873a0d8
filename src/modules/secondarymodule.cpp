#include "modules/secondarymodule.h"

SecondaryModule::SecondaryModule()
{
    selectable = false;
}

SecondaryModule::~SecondaryModule() = default;

QString SecondaryModule::Type()
{
    return QStringLiteral("secondary");
}

QString SecondaryModule::TestType()
{
    return Type();
}

bool SecondaryModule::Run(IKestoDevice *, const QMap<QString, QString> &)
{
    return false;
}

bool SecondaryModule::GetLogFilePaths(IKestoDevice *, QStringList &)
{
    return false;
}

bool SecondaryModule::IsLogComplete(IKestoDevice *)
{
    return true;
}

bool SecondaryModule::ParseLog(const QString &, TestResults &)
{
    return false;
}

void SecondaryModule::PostProcess(QMap<QString, QString> &)
{
}

QString SecondaryModule::ModuleName()
{
    return moduleName;
}

QString SecondaryModule::ModuleXMLName()
{
    return QStringLiteral("secondarymodule.xml");
}

bool SecondaryModule::ProcessModuleMIF(const QString &)
{
    return false;
}

bool SecondaryModule::ReadFromManifest(const XmlNode &element)
{
    _TestModule::ReadFromManifest(element);
    return false;
}

unsigned int SecondaryModule::KestoID()
{
    return 0;
}
