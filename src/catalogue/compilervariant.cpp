#include "catalogue/compilervariant.h"

#include <algorithm>

_CompilerVariant::_CompilerVariant() = default;
_CompilerVariant::~_CompilerVariant() = default;

QString _CompilerVariant::VariantPath()
{
    return packagePath.isEmpty() ? binPath : packagePath;
}

bool _CompilerVariant::ReadFromXML(const QDomElement &element)
{
    files.clear();
    name = element.attribute(QStringLiteral("name"));
    variant = element.attribute(QStringLiteral("variant"));
    binPath = element.attribute(QStringLiteral("binpath"));
    packagePath = element.attribute(QStringLiteral("packagepath"));
    arch = IKestoDevice::StringToTarget(element.attribute(QStringLiteral("arch")));
    build = element.attribute(QStringLiteral("build"));
    if (name.isEmpty())
        return false;

    for (QDomElement child = element.firstChildElement(); !child.isNull();
         child = child.nextSiblingElement()) {
        if (child.tagName().toLower() != QLatin1String("files"))
            continue;
        for (QDomElement file = child.firstChildElement(); !file.isNull();
             file = file.nextSiblingElement()) {
            const QString path = file.attribute(QStringLiteral("path"));
            if (!path.isEmpty())
                files.append(path);
        }
    }
    return true;
}

void _CompilerVariant::WriteToXML(QDomElement &element)
{
    element.setAttribute(QStringLiteral("name"), name);
    element.setAttribute(QStringLiteral("variant"), variant);
    element.setAttribute(QStringLiteral("binpath"), binPath);
    element.setAttribute(QStringLiteral("packagepath"), packagePath);
    element.setAttribute(QStringLiteral("arch"), IKestoDevice::TargetToString(arch));
    element.setAttribute(QStringLiteral("build"), build);
    if (files.isEmpty())
        return;
    QDomDocument document = element.ownerDocument();
    QDomElement list = document.createElement(QStringLiteral("files"));
    for (const QString &path : std::as_const(files)) {
        QDomElement file = document.createElement(QStringLiteral("File"));
        file.setAttribute(QStringLiteral("path"), path);
        list.appendChild(file);
    }
    element.appendChild(list);
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
