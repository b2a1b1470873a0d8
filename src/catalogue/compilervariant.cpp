#include "catalogue/compilervariant.h"

#include "common/xmlnode.h"

#include <algorithm>

_CompilerVariant::_CompilerVariant() = default;
_CompilerVariant::~_CompilerVariant() = default;

QString _CompilerVariant::VariantPath()
{
    return packagePath.isEmpty() ? binPath : packagePath;
}

template <class Element>
bool _CompilerVariant::ReadVariant(const Element &element)
{
    using namespace XmlRead;
    files.clear();
    name = Attribute(element, QStringLiteral("name"));
    variant = Attribute(element, QStringLiteral("variant"));
    binPath = Attribute(element, QStringLiteral("binpath"));
    packagePath = Attribute(element, QStringLiteral("packagepath"));
    arch = IKestoDevice::StringToTarget(Attribute(element, QStringLiteral("arch")));
    build = Attribute(element, QStringLiteral("build"));
    if (name.isEmpty())
        return false;

    ForEachChild(element, [this](const auto &child) {
        if (TagName(child).toLower() != QLatin1String("files"))
            return;
        ForEachChild(child, [this](const auto &file) {
            const QString path = Attribute(file, QStringLiteral("path"));
            if (!path.isEmpty())
                files.append(path);
        });
    });
    return true;
}

bool _CompilerVariant::ReadFromXML(const QDomElement &element)
{
    return ReadVariant(element);
}

bool _CompilerVariant::ReadFromXML(const XmlNode &element)
{
    return ReadVariant(element);
}

namespace {

template <class Element>
void WriteVariant(const _CompilerVariant &variant, Element &element)
{
    using namespace XmlBuild;
    SetAttribute(element, QStringLiteral("name"), variant.name);
    SetAttribute(element, QStringLiteral("variant"), variant.variant);
    SetAttribute(element, QStringLiteral("binpath"), variant.binPath);
    SetAttribute(element, QStringLiteral("packagepath"), variant.packagePath);
    SetAttribute(element, QStringLiteral("arch"), IKestoDevice::TargetToString(variant.arch));
    SetAttribute(element, QStringLiteral("build"), variant.build);
    if (variant.files.isEmpty())
        return;
    auto &&list = AppendElement(element, QStringLiteral("files"));
    for (const QString &path : variant.files) {
        auto &&file = AppendElement(list, QStringLiteral("File"));
        SetAttribute(file, QStringLiteral("path"), path);
    }
}

} // namespace

void _CompilerVariant::WriteToXML(QDomElement &element)
{
    WriteVariant(*this, element);
}

void _CompilerVariant::WriteToXML(XmlNode &element)
{
    WriteVariant(*this, element);
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
