#include "catalogue/framework.h"

#include "common/xmlnode.h"
#include "log/log.h"

QString ClassDirectory(unsigned int classId)
{
    return QStringLiteral("fs:/~0x%1").arg(classId, 8, 16, QLatin1Char('0'));
}

QString HexClassId(unsigned int classId)
{
    return QStringLiteral("0x%1").arg(classId, 8, 16, QLatin1Char('0'));
}

_Framework::_Framework() = default;
_Framework::~_Framework() = default;

void _Framework::SetLogger(Log *log)
{
    logger = log;
}

void _Framework::LogMessage(const QString &message, bool flag)
{
    if (logger)
        logger->LogMessage(message, flag);
}

QSharedPointer<_CompilerVariant> _Framework::GetVariant(IKestoDevice::Platform platform)
{
    for (auto it = variants.cbegin(); it != variants.cend(); ++it) {
        if (it.value() && it.value()->arch == platform)
            return it.value();
    }
    return {};
}

bool _Framework::ReadFromManifest(const QDomElement &element)
{
    return ReadFromManifest(*XmlNode::FromDom(element));
}

bool _Framework::ReadFromManifest(const XmlNode &element)
{
    name = element.Attribute(QStringLiteral("name"));
    if (name.isEmpty())
        return false;
    element.ForEachChildElement([this](const XmlNode &child) {
        const QString tag = child.Name().toLower();
        if (tag == QLatin1String("variant")) {
            QSharedPointer<_CompilerVariant> variant(new _CompilerVariant);
            if (variant->ReadFromXML(child))
                variants.insert(variant->name, variant);
        } else if (tag == QLatin1String("classid")) {
            bool ok = false;
            const unsigned int value = child.Attribute(QStringLiteral("value")).toUInt(&ok, 10);
            classId = ok ? value : 0;
        }
    });
    return true;
}

void _Framework::WriteToManifest(QDomElement &element)
{
    XmlNode node(element.tagName());
    WriteToManifest(node);
    node.CopyTo(element);
}

void _Framework::WriteToManifest(XmlNode &element)
{
    element.SetAttribute(QStringLiteral("name"), name);
    QList<QSharedPointer<_CompilerVariant>> sorted;
    ToList(variants, sorted);
    for (const auto &variant : std::as_const(sorted))
        variant->WriteToXML(element.AppendElement(QStringLiteral("variant")));
    XmlNode &id = element.AppendElement(QStringLiteral("classid"));
    id.SetAttribute(QStringLiteral("value"), QString::number(classId));
    id.SetAttribute(QStringLiteral("valuehex"), HexClassId(classId));
}

bool _Framework::IsLoaded(IKestoDevice *device)
{
    if (!device || classId == 0)
        return false;
    QString directory;
    if (device->FindModule(classId, directory) == 0)
        return true;
    QSharedPointer<_DirectoryInfo> info;
    if (device->ListDirectory(ClassDirectory(classId), info) != 0 || !info)
        return false;
    return info->HasFiles();
}

bool _Framework::Load(IKestoDevice *device, QMap<QString, QString> &)
{
    if (!device)
        return false;
    const QSharedPointer<_CompilerVariant> variant = GetVariant(device->platform);
    if (!variant)
        return false;
    return device->InstallPackage(variant->packagePath) == 0;
}

bool _Framework::PostLoad(IKestoDevice *, QMap<QString, QString> &)
{
    return true;
}

void _Framework::Unload(IKestoDevice *device, QMap<QString, QString> &)
{
    if (!device)
        return;
    QString directory;
    if (classId != 0 && device->FindModule(classId, directory) != 0)
        directory.clear();
    if (directory.isEmpty())
        directory = QStringLiteral("fs:/usermods/") + name;
    device->RemoveDirectory(directory);
}

void _Framework::PostProcess(QMap<QString, QString> &)
{
}
