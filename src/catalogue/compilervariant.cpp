#include "catalogue/compilervariant.h"

#include "common/xmlnode.h"

#include <algorithm>

_CompilerVariant::_CompilerVariant() = default;
_CompilerVariant::~_CompilerVariant() = default;

QString _CompilerVariant::VariantPath()
{
    return packagePath.isEmpty() ? binPath : packagePath;
}

bool _CompilerVariant::ReadFromXML(const QDomElement &element)
{
    return ReadFromXML(*XmlNode::FromDom(element));
}

bool _CompilerVariant::ReadFromXML(const XmlNode &element)
{
    files.clear();
    name = element.Attribute(QStringLiteral("name"));
    variant = element.Attribute(QStringLiteral("variant"));
    binPath = element.Attribute(QStringLiteral("binpath"));
    packagePath = element.Attribute(QStringLiteral("packagepath"));
    arch = IKestoDevice::StringToTarget(element.Attribute(QStringLiteral("arch")));
    build = element.Attribute(QStringLiteral("build"));
    if (name.isEmpty())
        return false;
    element.ForEachChildElement([this](const XmlNode &child) {
        if (child.Name().toLower() != QLatin1String("files"))
            return;
        child.ForEachChildElement([this](const XmlNode &file) {
            const QString path = file.Attribute(QStringLiteral("path"));
            if (!path.isEmpty())
                files.append(path);
        });
    });
    return true;
}

void _CompilerVariant::WriteToXML(QDomElement &element)
{
    XmlNode node(element.tagName());
    WriteToXML(node);
    node.CopyTo(element);
}

void _CompilerVariant::WriteToXML(XmlNode &element)
{
    element.SetAttribute(QStringLiteral("name"), name);
    element.SetAttribute(QStringLiteral("variant"), variant);
    element.SetAttribute(QStringLiteral("binpath"), binPath);
    element.SetAttribute(QStringLiteral("packagepath"), packagePath);
    element.SetAttribute(QStringLiteral("arch"), IKestoDevice::TargetToString(arch));
    element.SetAttribute(QStringLiteral("build"), build);
    if (files.isEmpty())
        return;
    XmlNode &list = element.AppendElement(QStringLiteral("files"));
    for (const QString &path : files)
        list.AppendElement(QStringLiteral("File")).SetAttribute(QStringLiteral("path"), path);
}

unsigned int ToList(const QMap<QString, QSharedPointer<_CompilerVariant>> &map,
                    QList<QSharedPointer<_CompilerVariant>> &out)
{
    out = map.values();
    std::sort(out.begin(), out.end(),
              [](const QSharedPointer<_CompilerVariant> &a, const QSharedPointer<_CompilerVariant> &b) {
                  return a->name < b->name;
              });
    return static_cast<unsigned int>(out.size());
}
