#include "resources/sysresource.h"

#include "common/xmlnode.h"
#include "resources/blockreader.h"

#include <QDomDocument>
#include <QStringList>

namespace {

constexpr quint32 kTypeProgramName = 0x0103C6D9;
constexpr quint32 kTypeService = 0x01089D3C;
constexpr quint32 kTypeServer = 0x0108AC1E;
constexpr quint32 kTypePrivilege = 0x0108BFD2;
constexpr quint32 kTypeIgnoredFour = 0x010C02E5;

QByteArray UpToNul(const QByteArray &bytes)
{
    const int nul = bytes.indexOf('\0');
    return nul < 0 ? bytes : bytes.left(nul);
}

} // namespace

SysResource::SysResource() : properties(std::make_unique<QObject>())
{
}

SysResource::~SysResource() = default;

SysResource::SysResource(const SysResource &other)
    : keysize(other.keysize), type(other.type), data(other.data), properties(std::make_unique<QObject>())
{
    for (const QByteArray &name : other.PropertyNames())
        properties->setProperty(name.constData(), other.properties->property(name.constData()));
}

SysResource &SysResource::operator=(const SysResource &other)
{
    if (this != &other) {
        SysResource copy(other);
        keysize = copy.keysize;
        type = copy.type;
        data = copy.data;
        properties = std::move(copy.properties);
    }
    return *this;
}

void SysResource::Reset()
{
    type = 0;
    keysize = 0;
    properties = std::make_unique<QObject>();
}

QVariant SysResource::Property(const char *name) const
{
    return properties->property(name);
}

void SysResource::SetProperty(const char *name, const QVariant &value)
{
    properties->setProperty(name, value);
}

QList<QByteArray> SysResource::PropertyNames() const
{
    return properties->dynamicPropertyNames();
}

void SysResource::Decode()
{
    BlockReader in(data);
    keysize = in.U16();
    type = in.U32();
    if (keysize == kNumericKeySize)
        SetProperty("Key", uint(in.U32()));
    else if (keysize != 0)
        SetProperty("Key", UpToNul(in.Bytes(keysize)));

    switch (type) {
    case kTypeProgram:
    case kTypeProgramAlt: {
        for (const char *name : {"version", "main id", "flags", "priority", "stack size", "max services", "max memory",
                                 "Privildedge Index"})
            SetProperty(name, uint(in.U32()));
        const quint32 argLength = in.U32();
        SetProperty("arg len", uint(argLength));
        if (argLength != 0)
            SetProperty("Arguments", UpToNul(in.Bytes(argLength)));
        break;
    }
    case kTypeProgramName: {
        SetProperty("Version", uint(in.U32()));
        const quint32 length = in.U32();
        SetProperty("program name length", uint(length));
        if (length != 0)
            SetProperty("Program Name", UpToNul(in.Bytes(length)));
        break;
    }
    case kTypeService:
        for (const char *name : {"Version", "transport id", "max invokes", "max handles", "stack size router",
                                 "stack size worker", "priority router", "priority worker", "Privildedge Index"})
            SetProperty(name, uint(in.U32()));
        break;
    case kTypeServer: {
        for (const char *name : {"mainid", "priority", "stack size"})
            SetProperty(name, uint(in.U32()));
        const quint32 overrides = in.U32();
        SetProperty("overrides", uint(overrides));
        SetProperty("Privildedge Index", uint(in.U32()));
        const quint32 argLength = in.U32();
        SetProperty("length of args", uint(argLength));
        SetProperty("flags", uint(in.U32()));
        // Three values per override: never more than the block can hold.
        const quint32 count = quint32(qMin<qint64>(overrides, in.Remaining() / 4));
        for (const char *format : {"override %1", "override IIDs %1", "override served %1"}) {
            for (quint32 i = 0; i < count; ++i)
                SetProperty(QString::fromLatin1(format).arg(i).toLatin1().constData(), uint(in.U32()));
        }
        if (argLength != 0)
            SetProperty("Arguments", UpToNul(in.Bytes(argLength)));
        break;
    }
    case kTypePrivilege:
        SetProperty("Privildedge Index", uint(in.U32()));
        break;
    case kTypeKeyedProgram: {
        const QStringList parts = Property("Key").toString().split(QLatin1Char(':'));
        if (parts.size() >= 3)
            SetProperty("Program Name", parts.at(2));
        break;
    }
    case kTypeIgnoredFour:
    default:
        break;
    }
}

void SysResource::WriteToXML(XmlNode &element)
{
    element.SetAttribute(QStringLiteral("type"), QString::number(type));
    element.SetAttribute(QStringLiteral("keysize"), QString::number(keysize));
    if (!data.isEmpty())
        element.AppendElement(QStringLiteral("data"));
    const QList<QByteArray> names = PropertyNames();
    if (names.isEmpty())
        return;
    XmlNode &list = element.AppendElement(QStringLiteral("properties"));
    for (const QByteArray &name : names) {
        const QVariant value = Property(name.constData());
        if (!value.isValid() || value.toString().isEmpty())
            continue;
        XmlNode &property = list.AppendElement(QStringLiteral("property"));
        property.SetAttribute(QStringLiteral("name"), QString::fromLatin1(name));
        property.SetAttribute(QStringLiteral("value"), value.toString());
    }
}

void SysResource::WriteToXML(QDomElement &element)
{
    XmlNode node(element.tagName());
    WriteToXML(node);
    node.CopyTo(element);
}

void SysResource::ReadFromXML(const XmlNode &element)
{
    Reset();
    type = element.Attribute(QStringLiteral("type")).toUInt();
    keysize = quint16(element.Attribute(QStringLiteral("keysize")).toUInt());
    element.ForEachChildElement([this](const XmlNode &child) {
        const QString name = child.Name().toLower();
        if (name == QLatin1String("data")) {
            // The manifest keeps only the mark that there were bytes.
            data.clear();
        } else if (name == QLatin1String("properties")) {
            child.ForEachChildElement([this](const XmlNode &property) {
                const QString propertyName = property.Attribute(QStringLiteral("name"));
                if (!propertyName.isEmpty())
                    SetProperty(propertyName.toLatin1().constData(),
                                property.Attribute(QStringLiteral("value")).toLatin1());
            });
        }
    });
}

void SysResource::ReadFromXML(const QDomElement &element)
{
    ReadFromXML(*XmlNode::FromDom(element));
}
