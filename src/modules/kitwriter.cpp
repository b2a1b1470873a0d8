#include "modules/kitwriter.h"

#include "archive/tar.h"
#include "catalogue/modulekind.h"
#include "common/xmlnode.h"
#include "common/xmlwriter.h"
#include "resources/mifbuilder.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>

QByteArray KitPackage::Mif() const
{
    MifBuilder mif;
    for (unsigned int id : classIds)
        mif.AddClass(id);
    for (unsigned int id : appletIds)
        mif.AddApplet(id);
    for (const KitProgram &program : programs)
        mif.AddProgram(program.name, program.arguments, program.type);
    for (const QString &key : suitePrograms)
        mif.AddSuiteProgram(key);
    return mif.Build();
}

KitMembers KitPackage::Members() const
{
    const QString prefix = directory.isEmpty() ? QString() : directory + QLatin1Char('/');
    const QString mif = mifName.isEmpty() ? directory + QStringLiteral(".mif") : mifName;
    KitMembers members;
    members.append({prefix + mif, Mif()});
    if (!behaviour.isEmpty())
        members.append({prefix + QStringLiteral("behaviour"), behaviour});
    for (const auto &file : files)
        members.append({prefix + file.first, file.second});
    return members;
}

KitWriter::KitWriter(const QString &root) : m_root(QDir::cleanPath(QDir::current().absoluteFilePath(root)))
{
    if (!QDir().mkpath(m_root))
        Fail(QStringLiteral("cannot create %1").arg(m_root));
}

QString KitWriter::DescriptionFileName(const QString &kind)
{
    const ModuleKind *found = FindModuleKind(kind);
    return found ? found->descriptionFile : QString();
}

QByteArray KitWriter::Description(const KitModule &module)
{
    XmlNode root(QStringLiteral("module"));
    XmlNode &suite = root.AppendElement(QStringLiteral("suite"));
    suite.SetAttribute(QStringLiteral("NAME"), module.name);
    if (!module.family.isEmpty())
        suite.SetAttribute(QStringLiteral("FAMILY"), module.family);
    if (!module.subFamily.isEmpty())
        suite.SetAttribute(QStringLiteral("SUBFAMILY"), module.subFamily);
    for (const QString &name : module.testCases) {
        XmlNode &testCase = suite.AppendElement(QStringLiteral("testcase"));
        testCase.SetAttribute(QStringLiteral("NAME"), name);
        testCase.SetAttribute(QStringLiteral("TYPE"), QStringLiteral("auto"));
    }
    if (!module.minKestoVersion.isEmpty())
        suite.AppendElement(QStringLiteral("minkestover")).AppendText(module.minKestoVersion);
    for (const QString &name : module.secondaryModules)
        suite.AppendElement(QStringLiteral("secondary_modules")).AppendText(name);
    return XmlWriter::Serialize(root);
}

bool KitWriter::WritePackage(const QString &path, const KitMembers &members)
{
    Tar tar;
    for (const auto &member : members)
        tar.AddFile(member.first, member.second);
    return tar.Write(path);
}

QString KitWriter::Path(const QString &relative) const
{
    return QDir::cleanPath(m_root + QLatin1Char('/') + relative);
}

QString KitWriter::Fail(const QString &message)
{
    m_errors.append(message);
    return QString();
}

QString KitWriter::AddDirectory(const QString &relative)
{
    const QString path = Path(relative);
    if (!QDir().mkpath(path))
        return Fail(QStringLiteral("cannot create %1").arg(path));
    return path;
}

QString KitWriter::AddFile(const QString &relative, const QByteArray &bytes, bool executable)
{
    const QString path = Path(relative);
    if (!QDir().mkpath(QFileInfo(path).absolutePath()))
        return Fail(QStringLiteral("cannot create the folder of %1").arg(path));
    QFile file(path);
    if (!file.open(QIODevice::WriteOnly | QIODevice::Truncate) || file.write(bytes) != bytes.size() || !file.flush())
        return Fail(QStringLiteral("cannot write %1").arg(path));
    file.close();
    if (executable
        && !file.setPermissions(file.permissions() | QFileDevice::ExeOwner | QFileDevice::ExeGroup
                                | QFileDevice::ExeOther))
        return Fail(QStringLiteral("cannot make %1 executable").arg(path));
    return path;
}

QString KitWriter::AddDescription(const QString &folder, const KitModule &module)
{
    const QString fileName = DescriptionFileName(module.kind);
    if (fileName.isEmpty())
        return Fail(QStringLiteral("unknown module kind %1").arg(module.kind));
    return AddFile(folder + QLatin1Char('/') + fileName, Description(module));
}

QString KitWriter::AddPackage(const QString &folder, const QString &baseName, const KitMembers &members)
{
    if (AddDirectory(folder).isEmpty())
        return QString();
    const QString path = Path(folder + QLatin1Char('/') + baseName + QStringLiteral(".kestix"));
    if (!WritePackage(path, members))
        return Fail(QStringLiteral("cannot write the package %1").arg(path));
    return path;
}

QString KitWriter::AddModulePackages(const QString &folder, const KitModule &module)
{
    KitPackage layout = module.package;
    if (layout.directory.isEmpty())
        layout.directory = module.name;
    const KitMembers members = layout.Members();
    for (const QString &variant : module.variants) {
        if (AddPackage(folder, module.name + QLatin1Char('_') + variant, members).isEmpty())
            return QString();
    }
    return Path(folder);
}

QString KitWriter::AddSourceModule(const QString &folder, const KitModule &module)
{
    const QString description = AddDescription(folder, module);
    if (description.isEmpty()
        || AddFile(folder + QStringLiteral("/src/") + module.name + QStringLiteral(".c"), module.source).isEmpty()
        || AddModulePackages(folder + QStringLiteral("/package"), module).isEmpty())
        return QString();
    return description;
}

QString KitWriter::AddPrebuiltModule(const QString &folder, const KitModule &module)
{
    const QString description = AddDescription(folder, module);
    if (description.isEmpty()
        || AddFile(folder + QLatin1Char('/') + module.name + QStringLiteral(".dll"), "MZ").isEmpty())
        return QString();
    return description;
}

QString KitWriter::AddFrameworkPackage(const QString &testframeworks, const QString &name, const QString &toolChain,
                                       const QString &build, const KitPackage *layout)
{
    KitPackage records;
    if (layout) {
        records = *layout;
    } else {
        records.directory = name;
        const ModuleKind *kind = FindModuleKind(name.toLower());
        if (kind && kind->frameworkClassId != 0)
            records.classIds = {kind->frameworkClassId};
    }
    return AddPackage(testframeworks + QStringLiteral("/run"),
                      name + QLatin1Char('_') + toolChain + QLatin1Char('_') + build, records.Members());
}
