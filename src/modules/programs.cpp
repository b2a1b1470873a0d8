#include "modules/programs.h"

#include "archive/tar.h"
#include "common/xmlnode.h"
#include "resources/kestoresources.h"

#include <QFileInfo>
#include <QVariant>
#include <QVector>

namespace Programs {

namespace {
constexpr quint16 kSysResourceType = 0x6000;
}

QString PropertyText(const SysResource &program, const char *name)
{
    return program.Property(name).toString();
}

int ReadFromManifest(const XmlNode &element, QList<SysResource> &programs)
{
    int count = 0;
    element.ForEachChildElement([&](const XmlNode &list) {
        if (list.Name().toLower() != QLatin1String("programs"))
            return;
        list.ForEachChildElement([&](const XmlNode &item) {
            if (item.Name().toLower() != QLatin1String("program"))
                return;
            SysResource program;
            program.ReadFromXML(item);
            programs.append(program);
            ++count;
        });
    });
    return count;
}

void WriteToManifest(XmlNode &element, QList<SysResource> &programs)
{
    if (programs.isEmpty())
        return;
    XmlNode &list = element.AppendElement(QStringLiteral("programs"));
    for (SysResource &program : programs) {
        XmlNode &item = list.AppendElement(QStringLiteral("program"));
        program.WriteToXML(item);
    }
}

bool ReadFromPackage(const QString &directory, const QString &moduleName, const QString &prefix,
                     unsigned int programType, QList<SysResource> &programs, QString *mifName)
{
    static const char *const kSuffixes[]
        = {"_Win32_Debug.kestix", "_Win32_Release.kestix", "RVCT22arm9_Release.kestix"};
    QString package;
    for (const QString &lead : {QStringLiteral("/"), QStringLiteral("/") + prefix}) {
        for (const char *suffix : kSuffixes) {
            const QString candidate = directory + lead + moduleName + QLatin1String(suffix);
            if (QFileInfo::exists(candidate)) {
                package = candidate;
                break;
            }
        }
        if (!package.isEmpty())
            break;
    }
    if (package.isEmpty())
        return false;

    Tar archive;
    if (!archive.Open(QIODevice::ReadOnly, package) || archive.IsDamaged())
        return false;
    const QString wanted = moduleName + QStringLiteral(".mif");
    for (unsigned int i = 0; i < archive.EntryCount(); ++i) {
        TarFileEntry entry = archive.Entry(i);
        if (!entry.name.contains(wanted, Qt::CaseInsensitive))
            continue;
        if (mifName)
            *mifName = entry.name.mid(entry.name.lastIndexOf(QLatin1Char('/')) + 1);
        const QByteArray data = archive.EntryData(entry);
        KestoResources resources;
        if (data.isEmpty() || !resources.LoadFrom(data))
            return true;
        QVector<quint16> ids;
        resources.GetIDs(kSysResourceType, ids);
        for (const quint16 id : std::as_const(ids)) {
            SysResource record;
            if (resources.GetSysResource(id, record) && record.type == programType)
                programs.append(record);
        }
        return true;
    }
    return false;
}

} // namespace Programs
