#include "support/kitbuilder.h"

#include "common/xmlwriter.h"
#include "catalogue/modulekind.h"

#include <QDir>
#include <QDomDocument>
#include <QFile>
#include <QFileInfo>
#include <QIODevice>

namespace kitbuilder {
namespace {

unsigned int KnownFrameworkClassId(const QString &name)
{
    const ModuleKind *kind = FindModuleKind(name.toLower());
    return kind ? kind->frameworkClassId : 0u;
}

} // namespace

QString DescriptionFileName(const QString &kind)
{
    const ModuleKind *found = FindModuleKind(kind);
    return found ? found->descriptionFile : QString();
}

QByteArray MakeDescription(const Module &module)
{
    QDomDocument document;
    QDomElement root = document.createElement(QStringLiteral("module"));
    document.appendChild(root);
    QDomElement suite = document.createElement(QStringLiteral("suite"));
    root.appendChild(suite);
    suite.setAttribute(QStringLiteral("NAME"), module.name);
    if (!module.family.isEmpty())
        suite.setAttribute(QStringLiteral("FAMILY"), module.family);
    if (!module.subFamily.isEmpty())
        suite.setAttribute(QStringLiteral("SUBFAMILY"), module.subFamily);
    for (const QString &name : module.testCases) {
        QDomElement testCase = document.createElement(QStringLiteral("testcase"));
        testCase.setAttribute(QStringLiteral("NAME"), name);
        testCase.setAttribute(QStringLiteral("TYPE"), QStringLiteral("auto"));
        suite.appendChild(testCase);
    }
    if (!module.minKestoVersion.isEmpty()) {
        QDomElement version = document.createElement(QStringLiteral("minkestover"));
        version.appendChild(document.createTextNode(module.minKestoVersion));
        suite.appendChild(version);
    }
    for (const QString &name : module.secondaryModules) {
        QDomElement secondary = document.createElement(QStringLiteral("secondary_modules"));
        secondary.appendChild(document.createTextNode(name));
        suite.appendChild(secondary);
    }
    return XmlWriter::Serialize(document);
}

KitBuilder::KitBuilder(const QString &root)
    : m_root(QDir::cleanPath(QDir::current().absoluteFilePath(root)))
{
    if (!QDir().mkpath(m_root))
        Fail(QStringLiteral("cannot create %1").arg(m_root));
}

QString KitBuilder::Path(const QString &relative) const
{
    return QDir::cleanPath(m_root + QLatin1Char('/') + relative);
}

QString KitBuilder::Fail(const QString &message)
{
    m_errors.append(message);
    return QString();
}

QString KitBuilder::AddDirectory(const QString &relative)
{
    const QString path = Path(relative);
    if (!QDir().mkpath(path))
        return Fail(QStringLiteral("cannot create %1").arg(path));
    return path;
}

QString KitBuilder::AddFile(const QString &relative, const QByteArray &bytes)
{
    const QString path = Path(relative);
    if (!QDir().mkpath(QFileInfo(path).absolutePath()))
        return Fail(QStringLiteral("cannot create the folder of %1").arg(path));
    QFile file(path);
    if (!file.open(QIODevice::WriteOnly | QIODevice::Truncate)
        || file.write(bytes) != bytes.size() || !file.flush())
        return Fail(QStringLiteral("cannot write %1").arg(path));
    return path;
}

QString KitBuilder::AddDescription(const QString &folder, const Module &module)
{
    const QString fileName = DescriptionFileName(module.kind);
    if (fileName.isEmpty())
        return Fail(QStringLiteral("unknown module kind %1").arg(module.kind));
    return AddFile(folder + QLatin1Char('/') + fileName, MakeDescription(module));
}

QString KitBuilder::AddPackage(const QString &folder, const QString &baseName,
                               const testutil::Members &members)
{
    if (AddDirectory(folder).isEmpty())
        return QString();
    const QString path = Path(folder + QLatin1Char('/') + baseName + QStringLiteral(".kestix"));
    if (!testutil::WritePackage(path, members))
        return Fail(QStringLiteral("cannot write package %1").arg(path));
    return path;
}

QString KitBuilder::AddModulePackages(const QString &folder, const Module &module)
{
    testutil::ModuleSpec layout = module.package;
    if (layout.directory.isEmpty())
        layout.directory = module.name;
    const testutil::Members members = testutil::ModuleMembers(layout);
    for (const QString &variant : module.variants) {
        if (AddPackage(folder, module.name + QLatin1Char('_') + variant, members).isEmpty())
            return QString();
    }
    return Path(folder);
}

QString KitBuilder::AddSourceModule(const QString &folder, const Module &module)
{
    const QString description = AddDescription(folder, module);
    if (description.isEmpty()
        || AddFile(folder + QStringLiteral("/src/") + module.name + QStringLiteral(".c"),
                   QByteArrayLiteral("int main(void) { return 0; }\n")).isEmpty()
        || AddModulePackages(folder + QStringLiteral("/package"), module).isEmpty())
        return QString();
    return description;
}

QString KitBuilder::AddPrebuiltModule(const QString &folder, const Module &module)
{
    const QString description = AddDescription(folder, module);
    if (description.isEmpty()
        || AddFile(folder + QLatin1Char('/') + module.name + QStringLiteral(".dll"), "MZ").isEmpty())
        return QString();
    return description;
}

QString KitBuilder::AddFrameworkPackage(const QString &testframeworks, const QString &name,
                                        const QString &toolChain, const QString &build,
                                        const testutil::ModuleSpec *layout)
{
    testutil::ModuleSpec records;
    if (layout) {
        records = *layout;
    } else {
        records.directory = name;
        if (const unsigned int classId = KnownFrameworkClassId(name))
            records.classIds = {classId};
    }
    return AddPackage(testframeworks + QStringLiteral("/run"),
                      name + QLatin1Char('_') + toolChain + QLatin1Char('_') + build,
                      testutil::ModuleMembers(records));
}

} // namespace kitbuilder
