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

template <class Element>
bool _Framework::ReadEntry(const Element &element)
{
    using namespace XmlRead;
    name = Attribute(element, QStringLiteral("name"));
    if (name.isEmpty())
        return false;
    ForEachChild(element, [this](const auto &child) {
        const QString tag = TagName(child).toLower();
        if (tag == QLatin1String("variant")) {
            QSharedPointer<_CompilerVariant> variant(new _CompilerVariant);
            if (variant->ReadFromXML(child))
                variants.insert(variant->name, variant);
        } else if (tag == QLatin1String("classid")) {
            bool ok = false;
            const unsigned int value = Attribute(child, QStringLiteral("value")).toUInt(&ok, 10);
            classId = ok ? value : 0;
        }
    });
    return true;
}

bool _Framework::ReadFromManifest(const QDomElement &element)
{
    return ReadEntry(element);
}

bool _Framework::ReadFromManifest(const XmlNode &element)
{
    return ReadEntry(element);
}

template <class Element>
void _Framework::WriteEntry(Element &element)
{
    using namespace XmlBuild;
    SetAttribute(element, QStringLiteral("name"), name);
    QList<QSharedPointer<_CompilerVariant>> sorted;
    ToList(variants, sorted);
    for (const auto &variant : std::as_const(sorted)) {
        auto &&child = AppendElement(element, QStringLiteral("variant"));
        variant->WriteToXML(child);
    }
    auto &&id = AppendElement(element, QStringLiteral("classid"));
    SetAttribute(id, QStringLiteral("value"), QString::number(classId));
    SetAttribute(id, QStringLiteral("valuehex"), HexClassId(classId));
}

void _Framework::WriteToManifest(QDomElement &element)
{
    WriteEntry(element);
}

void _Framework::WriteToManifest(XmlNode &element)
{
    WriteEntry(element);
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
