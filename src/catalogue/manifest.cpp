#include "catalogue/manifest.h"

#include "catalogue/framework.h"
#include "catalogue/modulekind.h"
#include "catalogue/testmodule.h"
#include "common/stringhash.h"
#include "common/xmlnode.h"
#include "common/xmlwriter.h"
#include "environment/testdirectories.h"
#include "log/log.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QSaveFile>

namespace {

// Caches older than this format are stale and trigger a new scan.
constexpr unsigned int kManifestVersion = 5;

// name with every "*" removed, compared with moduleName as the pattern's
// leading and trailing "*" ask: exactly, as prefix, as suffix or contained.
bool MatchesPattern(const QString &pattern, const QString &moduleName)
{
    const bool leading = pattern.startsWith(QLatin1Char('*'));
    const bool trailing = pattern.endsWith(QLatin1Char('*'));
    const QString text = QString(pattern).remove(QLatin1Char('*'));
    if (leading && trailing)
        return moduleName.contains(text, Qt::CaseInsensitive);
    if (leading)
        return moduleName.endsWith(text, Qt::CaseInsensitive);
    if (trailing)
        return moduleName.startsWith(text, Qt::CaseInsensitive);
    return moduleName.compare(text, Qt::CaseInsensitive) == 0;
}

} // namespace

Manifest::Manifest(const QString &path, bool isPlatform)
    : isPlatform(isPlatform), kitPath(QDir::cleanPath(QDir::current().absoluteFilePath(path)))
{
    rootHash = StringHashName(kitPath);
    cacheDirectory = TestDirectories::GetManifestDirectory(rootHash);
    cacheFile = cacheDirectory + QDir::separator() + QStringLiteral("Manifest.xml");
}

Manifest::~Manifest() = default;
Manifest::Manifest(const Manifest &other) = default;
Manifest &Manifest::operator=(const Manifest &other) = default;

void Manifest::SetLogger(Log *logger)
{
    this->logger = logger;
}

void Manifest::LogMessage(const QString &message, bool flag)
{
    if (logger)
        logger->LogMessage(message, flag);
}

QString Manifest::RootHash()
{
    return rootHash;
}

QString Manifest::ManifestFilePath()
{
    return cacheFile;
}

QString Manifest::ManifestCachePath()
{
    return cacheFile;
}

std::unique_ptr<XmlNode> Manifest::ReadCacheDocument(const QString &path)
{
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly))
        return nullptr;
    std::unique_ptr<XmlNode> root = XmlNode::Parse(file.readAll());
    if (!root || root->Name().toLower() != QLatin1String("testkit"))
        return nullptr;
    return root;
}

bool Manifest::IsVersionOkay()
{
    testModules.clear();
    const std::unique_ptr<XmlNode> root = ReadCacheDocument(cacheFile);
    return root && IsCurrent(*root);
}

bool Manifest::IsCurrent(const XmlNode &root)
{
    QString version = root.Attribute(QStringLiteral("version"));
    if (version.isEmpty())
        version = QStringLiteral("0");
    bool ok = false;
    const unsigned int number = version.toUInt(&ok, 10);
    return ok && number >= kManifestVersion;
}

QSharedPointer<_TestModule> Manifest::CreateModule(const QString &type)
{
    const ModuleKind *kind = FindModuleKind(type);
    return kind ? kind->createModule() : QSharedPointer<_TestModule>();
}

QSharedPointer<_Framework> Manifest::CreateFramework(const QString &name)
{
    const ModuleKind *kind = FindModuleKind(name);
    if (kind && kind->createFramework)
        return kind->createFramework();
    return QSharedPointer<_Framework>(new _Framework);
}

bool Manifest::ReadManifest()
{
    testModules.clear();
    const std::unique_ptr<XmlNode> root = ReadCacheDocument(cacheFile);
    if (!root)
        return false;
    ReadDocument(*root);
    return true;
}

void Manifest::ReadDocument(const XmlNode &root)
{
    for (const XmlNode *section : root.ChildElements()) {
        const QString sectionName = section->Name().toLower();
        if (sectionName == QLatin1String("testmodules")) {
            for (const XmlNode *entry : section->ChildElements()) {
                if (entry->Name().toLower() != QLatin1String("testmodule"))
                    continue;
                QSharedPointer<_TestModule> module = CreateModule(entry->Attribute(QStringLiteral("testtype")));
                if (!module)
                    continue;
                // A module without a name is kept all the same, under the
                // empty key.
                module->ReadFromManifest(*entry);
                testModules.insert(module->moduleName.toLower(), module);
            }
        } else if (sectionName == QLatin1String("frameworks")) {
            for (const XmlNode *entry : section->ChildElements()) {
                if (entry->Name().toLower() != QLatin1String("framework"))
                    continue;
                QSharedPointer<_Framework> framework = CreateFramework(entry->Attribute(QStringLiteral("name")));
                if (framework->ReadFromManifest(*entry))
                    frameworks.insert(framework->name, framework);
            }
        }
    }
}

bool Manifest::WriteManifest(const QString &path)
{
    if (testModules.isEmpty()) {
        LogMessage(QStringLiteral("WriteManifest has zero test cases to write"), true);
        return false;
    }

    QString destination = path;
    if (destination.isEmpty()) {
        destination = cacheFile;
        // The folder may have gone since construction.
        QDir().mkpath(cacheDirectory);
    }
    const auto fail = [this, &destination](const QString &error) {
        LogMessage(QStringLiteral("Manifest::WriteManifest could not write %1: %2\n").arg(destination, error), true);
        return false;
    };
    // Written beside the destination and renamed over it once complete.
    QSaveFile file(destination);
    if (!file.open(QIODevice::WriteOnly))
        return fail(file.errorString());

    // A catalogue of thousands of modules would make a DOM of hundreds of
    // megabytes: each module is built as a light tree of its own and its
    // text goes to the file before the next one is built.
    XmlNode root(QStringLiteral("testkit"));
    root.SetAttribute(QStringLiteral("path"), kitPath);
    root.SetAttribute(QStringLiteral("hash"), rootHash);
    root.SetAttribute(QStringLiteral("version"), QString::number(kManifestVersion));
    XmlWriter::DocumentStream out(1, &file);
    out.Open(root);
    out.Open(XmlNode(QStringLiteral("testmodules")));
    for (const QSharedPointer<_TestModule> &module : std::as_const(testModules)) {
        XmlNode entry(QStringLiteral("testmodule"));
        module->WriteToManifest(entry);
        out.Write(entry);
    }
    out.Close();

    if (!frameworks.isEmpty()) {
        XmlNode list(QStringLiteral("frameworks"));
        for (const QSharedPointer<_Framework> &framework : std::as_const(frameworks))
            framework->WriteToManifest(list.AppendElement(QStringLiteral("framework")));
        out.Write(list);
    }

    out.Finish();
    if (!out.Ok()) {
        const QString error = file.errorString();
        file.cancelWriting();
        return fail(error);
    }
    if (!file.commit())
        return fail(file.errorString());
    return true;
}

QSharedPointer<_TestModule> Manifest::FindTestModule(const QString &name)
{
    const QString key = name.toLower();
    // Modules are normally keyed by their lower-cased name; secondary modules
    // moved in by a scan keep their name as written, hence the walk.
    const QSharedPointer<_TestModule> keyed = testModules.value(key);
    if (keyed && keyed->moduleName.toLower() == key)
        return keyed;
    for (const QSharedPointer<_TestModule> &module : std::as_const(testModules)) {
        if (module->moduleName.toLower() == key)
            return module;
    }
    return {};
}

unsigned int Manifest::GetTestModules(QList<QSharedPointer<_TestModule>> &out, const QStringList &names,
                                      const QString &family, const QString &subFamily)
{
    for (const QSharedPointer<_TestModule> &module : std::as_const(testModules)) {
        if (!module->selectable)
            continue;
        bool matches = false;
        if (names.isEmpty()) {
            matches = family.isEmpty()
                || (module->family.contains(family, Qt::CaseInsensitive)
                    && (subFamily.isEmpty() || module->subFamily.contains(subFamily, Qt::CaseInsensitive)));
        } else {
            for (const QString &pattern : names) {
                if (MatchesPattern(pattern, module->moduleName)) {
                    matches = true;
                    break;
                }
            }
        }
        if (matches)
            out.append(module);
    }
    return static_cast<unsigned int>(out.size());
}

unsigned int Manifest::GetFrameworks(QList<QSharedPointer<_Framework>> &out)
{
    out = frameworks.values();
    return static_cast<unsigned int>(out.size());
}
