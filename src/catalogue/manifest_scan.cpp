// Building a catalogue by walking a kit's directory tree.

#include "catalogue/manifest.h"

#include "archive/tar.h"
#include "catalogue/framework.h"
#include "catalogue/modulekind.h"
#include "catalogue/testmodule.h"
#include "common/xmlnode.h"
#include "environment/platforms.h"
#include "resources/kestoresources.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QHash>
#include <QSet>

#include <dirent.h>
#include <sys/stat.h>

#include <algorithm>
#include <utility>
#include <vector>

// One module-information member of a package, decoded.
struct Manifest::MifRecord
{
    QString lowerName;
    bool loaded = false;
    QVector<Applet> applets;
    QVector<unsigned int> classes;
};

// One entry of a listed directory: what the scan asks of it, read from the
// directory itself (no stat per entry unless it is a link).
struct Manifest::DirEntry
{
    QString name;
    // The directory as given joined with name, and its absolute form, both
    // cleaned.
    QString path;
    QString absolutePath;
    bool isDir = false;

    bool IsFile() const { return !isDir; }
    // The name up to its first dot, after its last dot, after its first dot.
    QString BaseName() const { return name.section(QLatin1Char('.'), 0, 0); }
    QString Suffix() const
    {
        const qsizetype dot = name.lastIndexOf(QLatin1Char('.'));
        return dot < 0 ? QString() : name.mid(dot + 1);
    }
    QString CompleteSuffix() const
    {
        const qsizetype dot = name.indexOf(QLatin1Char('.'));
        return dot < 0 ? QString() : name.mid(dot + 1);
    }
};

// What one scan remembers so that it lists each directory and reads each
// package once, and never walks a directory twice (a symbolic link pointing
// back up the tree would otherwise send it round for ever).
struct Manifest::ScanState
{
    // Directories walked, by device and inode: one stat per directory
    // instead of resolving every component of its path.
    QSet<QPair<quint64, quint64>> visited;
    QHash<QString, QList<Manifest::DirEntry>> listings;
    QHash<QString, QList<MifRecord>> packages;
    QSet<QString> damagedPackages;
};

namespace {

const QLatin1String kPackageSuffix("kestix");

// Leading path parts that say nothing about a module's family.
const QSet<QString> &PathWordsToSkip()
{
    static const QSet<QString> words{QStringLiteral("api"), QStringLiteral("tests")};
    return words;
}

// Whether a sub-folder of a "testframeworks" folder stands for a framework:
// its lower-cased name is the type word of a kind that has one.
// An empty module of the kind that bare "package" folders give.
QSharedPointer<_TestModule> PackageFolderModule()
{
    const ModuleKind *kind = FindModuleKind(&ModuleKind::fromPackageFolder);
    return kind ? kind->createModule() : QSharedPointer<_TestModule>();
}

bool IsFrameworkWord(const QString &lowerName)
{
    const ModuleKind *kind = FindModuleKind(lowerName);
    return kind && kind->frameworkClassId != 0;
}

// Handset architecture of a tool-chain, by lower-cased tool-chain name.
IKestoDevice::Platform ArchitectureOf(const QString &toolChain)
{
    static const QHash<QString, IKestoDevice::Platform> table{
        {QStringLiteral("win32"), IKestoDevice::PLATFORM_WIN32},
        {QStringLiteral("rvct22arm9"), IKestoDevice::PLATFORM_ARM},
        {QStringLiteral("rvct30arm11"), IKestoDevice::PLATFORM_ARM},
        {QStringLiteral("mingw"), IKestoDevice::PLATFORM_ARM},
        {QStringLiteral("armgcc"), IKestoDevice::PLATFORM_ARM},
    };
    return table.value(toolChain.toLower(), IKestoDevice::PLATFORM_UNKNOWN);
}

// Class ID of a framework's main component, by lower-cased framework name.
unsigned int FrameworkClassId(const QString &name)
{
    const ModuleKind *kind = FindModuleKind(name);
    return kind ? kind->frameworkClassId : 0u;
}

// Module kind of a description file, by a case-insensitive look at its path;
// null when the file describes no module.
const ModuleKind *DescriptionKind(const QString &path)
{
    const QString lower = path.toLower();
    for (const ModuleKind &kind : ModuleKinds()) {
        if (lower.contains(kind.descriptionFile))
            return &kind;
    }
    return nullptr;
}

QString JoinPath(const QString &dir, const QString &name)
{
    return dir.endsWith(QLatin1Char('/')) ? dir + name : dir + QLatin1Char('/') + name;
}

// The directories and files of dir (following links; hidden entries, broken
// links, devices, pipes and sockets left out) sorted by name regardless of
// case.
QList<Manifest::DirEntry> ListEntries(const QString &dir)
{
    QList<Manifest::DirEntry> entries;
    const QByteArray encoded = QFile::encodeName(dir);
    DIR *stream = ::opendir(encoded.constData());
    if (!stream)
        return entries;
    const QString base = QDir::cleanPath(dir);
    const QString absoluteBase = QDir::isAbsolutePath(base) ? base : QDir::cleanPath(QDir(dir).absolutePath());
    std::vector<std::pair<QString, Manifest::DirEntry>> sorted;
    while (const struct dirent *item = ::readdir(stream)) {
        if (item->d_name[0] == '.')
            continue;
        bool isDir = item->d_type == DT_DIR;
        if (item->d_type != DT_DIR && item->d_type != DT_REG) {
            if (item->d_type != DT_LNK && item->d_type != DT_UNKNOWN)
                continue;
            struct stat status;
            const QByteArray full = encoded + '/' + item->d_name;
            if (::stat(full.constData(), &status) != 0)
                continue;
            if (!S_ISDIR(status.st_mode) && !S_ISREG(status.st_mode))
                continue;
            isDir = S_ISDIR(status.st_mode);
        }
        Manifest::DirEntry entry;
        entry.name = QFile::decodeName(item->d_name);
        entry.path = JoinPath(base, entry.name);
        entry.absolutePath = absoluteBase == base ? entry.path : JoinPath(absoluteBase, entry.name);
        entry.isDir = isDir;
        sorted.emplace_back(entry.name.toLower(), std::move(entry));
    }
    ::closedir(stream);
    std::sort(sorted.begin(), sorted.end(), [](const auto &a, const auto &b) {
        return a.first != b.first ? a.first < b.first : a.second.name < b.second.name;
    });
    entries.reserve(qsizetype(sorted.size()));
    for (auto &item : sorted)
        entries.append(std::move(item.second));
    return entries;
}

bool IsPackageFile(const Manifest::DirEntry &entry)
{
    return entry.IsFile() && entry.CompleteSuffix().toLower() == kPackageSuffix;
}

// A package file named <name>_<tool-chain>_<build>.kestix as a compiler
// variant; null when the name does not split so. name receives the leading
// part.
QSharedPointer<_CompilerVariant> PackageVariant(const Manifest::DirEntry &package, QString &name)
{
    QString first, toolChain, build;
    if (!BreakPackageName(package.BaseName(), first, toolChain, build))
        return {};
    QSharedPointer<_CompilerVariant> variant(new _CompilerVariant);
    variant->name = package.BaseName();
    variant->variant = toolChain;
    variant->build = build;
    variant->packagePath = package.absolutePath;
    variant->arch = ArchitectureOf(toolChain);
    name = first;
    return variant;
}

} // namespace

bool Manifest::GenerateManifest(bool force)
{
    // IsVersionOkay followed by ReadManifest, parsing the cache only once; a
    // forced scan has no use for the cache.
    testModules.clear();
    if (!force && QFileInfo::exists(cacheFile)) {
        const std::unique_ptr<XmlNode> root = ReadCacheDocument(cacheFile);
        if (root && IsCurrent(*root)) {
            ReadDocument(*root);
            return true;
        }
    }

    ScanState state;
    m_scan = &state;
    ProcessTheSubDir(kitPath);
    m_scan = nullptr;
    ProcessSecondaryModules();
    return WriteManifest(QString());
}

QList<Manifest::DirEntry> Manifest::Listing(const QString &dir)
{
    if (!m_scan)
        return ListEntries(dir);
    auto found = m_scan->listings.constFind(dir);
    if (found != m_scan->listings.constEnd())
        return found.value();
    const QList<DirEntry> entries = ListEntries(dir);
    m_scan->listings.insert(dir, entries);
    return entries;
}

void Manifest::ForgetListing(const QString &dir)
{
    if (!m_scan)
        return;
    auto found = m_scan->listings.find(dir);
    if (found == m_scan->listings.end())
        return;
    for (const DirEntry &entry : std::as_const(found.value())) {
        if (IsPackageFile(entry))
            m_scan->packages.remove(entry.absolutePath);
    }
    m_scan->listings.erase(found);
}

void Manifest::ProcessTheSubDir(const QString &dir)
{
    struct stat status;
    if (::stat(QFile::encodeName(dir).constData(), &status) != 0 || !S_ISDIR(status.st_mode))
        return;
    if (m_scan) {
        const QPair<quint64, quint64> identity(quint64(status.st_dev), quint64(status.st_ino));
        if (m_scan->visited.contains(identity))
            return;
        m_scan->visited.insert(identity);
    }

    const QList<DirEntry> entries = Listing(dir);
    QStringList packageDirs;
    for (const DirEntry &entry : entries) {
        if (entry.isDir) {
            const QString base = entry.BaseName().toLower();
            if (base == QLatin1String("testframeworks") && !isPlatform) {
                ProcessFrameworkDirectory(entry.path);
            } else if (base == QLatin1String("package")) {
                QSharedPointer<_TestModule> module = PackageFolderModule();
                if (!module)
                    continue;
                const QString path = entry.absolutePath;
                ProcessPackageDir(module, path);
                secondaryModules.insert(module->moduleName, module);
                packageDirs.append(path);
            } else {
                ProcessTheSubDir(entry.path);
            }
        } else if (entry.Suffix().toLower() == QLatin1String("xml")) {
            ProcessXMLDocument(entry.absolutePath);
        }
    }

    // Nothing below this folder asks for these listings again.
    for (const QString &path : std::as_const(packageDirs))
        ForgetListing(path);
    ForgetListing(QDir::cleanPath(dir + QDir::separator() + QStringLiteral("package")));
    ForgetListing(dir);
}

void Manifest::ProcessFrameworkDirectory(const QString &dir)
{
    const QString runDir = dir + QDir::separator() + QStringLiteral("run");
    if (QFileInfo::exists(runDir)) {
        for (const DirEntry &entry : ListEntries(runDir)) {
            if (!IsPackageFile(entry))
                continue;
            QString name;
            const QSharedPointer<_CompilerVariant> variant = PackageVariant(entry, name);
            if (!variant)
                continue;
            QSharedPointer<_Framework> framework = frameworks.value(name);
            if (!framework) {
                const QString lower = name.toLower();
                framework = CreateFramework(lower);
                framework->name = lower;
                framework->classId = FrameworkClassId(lower);
                frameworks.insert(name, framework);
            }
            framework->variants.insert(variant->name, variant);
        }
        return;
    }

    for (const DirEntry &entry : ListEntries(dir)) {
        if (!entry.isDir)
            continue;
        const QString lower = entry.name.toLower();
        if (!IsFrameworkWord(lower))
            continue;
        QSharedPointer<_Framework> framework(new _Framework);
        framework->name = lower;
        frameworks.insert(lower, framework);
    }
}

bool Manifest::ProcessXMLDocument(const QString &path)
{
    const ModuleKind *kind = DescriptionKind(path);
    if (!kind)
        return false;
    QSharedPointer<_TestModule> module = kind->createModule();
    module->SetSource(isPlatform ? QStringLiteral("PVS") : QStringLiteral("KVK"));
    if (!module->ProcessModuleXML(path))
        return false;

    const QString key = module->moduleName.toLower();
    const QSharedPointer<_TestModule> stored = testModules.value(key);
    if (stored) {
        // The first description of a name wins; a later one only adds what
        // its folder holds.
        module = stored;
    } else {
        testModules.insert(key, module);
        if (module->family.isEmpty()) {
            QStringList parts = QString(path).remove(kitPath).split(QLatin1Char('/'));
            while (!parts.isEmpty() && (parts.first().isEmpty() || PathWordsToSkip().contains(parts.first().toLower())))
                parts.removeFirst();
            if (parts.size() >= 2) {
                module->family = parts.at(0);
                module->subFamily = parts.at(1);
            }
        }
    }

    ProcessXMLDir(path, module);
    return true;
}

void Manifest::ProcessXMLDir(const QString &xmlPath, QSharedPointer<_TestModule> module)
{
    const QString dir = QFileInfo(xmlPath).absolutePath();
    const QList<DirEntry> entries = Listing(dir);
    if (entries.isEmpty())
        return;

    enum class Kind { None, Source, Prebuilt };
    Kind kind = Kind::None;
    bool kindFound = false;
    bool packageDone = false;
    // Only the OAT kind comes with a base-line file.
    const ModuleKind *moduleKind = FindModuleKind(module->TestType());
    bool baseLineDone = !moduleKind || !moduleKind->hasBaseLine;

    for (const DirEntry &entry : entries) {
        const QString name = entry.name.toLower();
        if (name.contains(QLatin1String(".mod")) || name.contains(QLatin1String(".dll"))) {
            kind = Kind::Prebuilt;
            kindFound = true;
        } else if (name.contains(QLatin1String(".c")) || name.contains(QLatin1String("src"))
                   || name.contains(QLatin1String("inc")) || name.contains(QLatin1String("mif"))) {
            module->sourcePath = dir;
            kind = Kind::Source;
            kindFound = true;
        } else if (name.contains(QLatin1String(".baseline"))) {
            module->baseLineFile = entry.absolutePath;
            baseLineDone = true;
        } else if (name.contains(QLatin1String("package"))) {
            packageDone = module->ProcessPackage(entry.absolutePath);
        }
        if (kindFound && packageDone && baseLineDone)
            break;
    }

    if (kind == Kind::Source)
        ProcessSource(module, dir);
    else if (kind == Kind::Prebuilt)
        ProcessTarget(module, dir);
}

void Manifest::ProcessSource(QSharedPointer<_TestModule> module, const QString &dir)
{
    const QString packageDir = QDir::cleanPath(dir + QDir::separator() + QStringLiteral("package"));
    if (QFileInfo::exists(packageDir))
        ProcessPackageDir(module, packageDir);
}

void Manifest::ProcessTarget(QSharedPointer<_TestModule>, const QString &)
{
    // Prebuilt binaries beside a description give the module no targets.
}

void Manifest::ProcessPackageDir(QSharedPointer<_TestModule> module, const QString &dir)
{
    for (const DirEntry &entry : Listing(dir)) {
        QList<MifRecord> mifs;
        if (!IsPackageFile(entry) || !PackageMifs(entry.absolutePath, mifs))
            continue;
        DecompileKestoPackage(module, entry.absolutePath);
        QString name;
        const QSharedPointer<_CompilerVariant> variant = PackageVariant(entry, name);
        if (!variant)
            continue;
        if (module->moduleName.isEmpty())
            module->moduleName = name;
        if (!module->targets.contains(variant->name))
            module->targets.insert(variant->name, variant);
    }
}

bool Manifest::PackageMifs(const QString &package, QList<MifRecord> &records)
{
    records.clear();
    if (m_scan) {
        if (m_scan->damagedPackages.contains(package))
            return false;
        auto found = m_scan->packages.constFind(package);
        if (found != m_scan->packages.constEnd()) {
            records = found.value();
            return true;
        }
    }

    Tar tar;
    if (tar.Open(QIODevice::ReadOnly, package)) {
        if (tar.IsDamaged()) {
            LogMessage(QStringLiteral("Manifest::ProcessPackageDir refused %1: %2\n")
                           .arg(QDir::toNativeSeparators(package), tar.ErrorString()),
                       true);
            if (m_scan)
                m_scan->damagedPackages.insert(package);
            return false;
        }
        const unsigned int count = tar.EntryCount();
        for (unsigned int index = 0; index < count; ++index) {
            TarFileEntry entry = tar.Entry(index);
            MifRecord record;
            record.lowerName = entry.name.toLower();
            // Only a member whose name holds ".mif" can ever be asked for.
            if (!entry.IsFile() || !record.lowerName.contains(QLatin1String(".mif")))
                continue;
            const QByteArray data = tar.EntryData(entry);
            KestoResources resources;
            if (!data.isEmpty() && resources.LoadFrom(data)) {
                record.loaded = true;
                resources.GetMifApplets(record.applets);
                resources.GetMifClasses(record.classes);
            }
            records.append(record);
        }
        tar.Close();
    }
    if (m_scan)
        m_scan->packages.insert(package, records);
    return true;
}

void Manifest::DecompileKestoPackage(QSharedPointer<_TestModule> module, const QString &package)
{
    if (!module->classids.isEmpty() || !module->applets.isEmpty())
        return;
    const QString wanted = (module->moduleName + QStringLiteral(".mif")).toLower();
    QList<MifRecord> records;
    PackageMifs(package, records);
    for (const MifRecord &record : std::as_const(records)) {
        if (!record.lowerName.contains(wanted) || !record.loaded)
            continue;
        module->applets = record.applets;
        module->classids = record.classes;
        return;
    }
}

void Manifest::ProcessSecondaryModules()
{
    // How many catalogue modules answer to each lower-cased name: the same
    // answers FindTestModule gives, without walking the catalogue per module.
    QHash<QString, int> names;
    for (const QSharedPointer<_TestModule> &module : std::as_const(testModules))
        ++names[module->moduleName.toLower()];
    const auto taken = [&names](const QString &name) {
        return names.value(name.toLower()) > 0;
    };

    for (auto it = secondaryModules.cbegin(); it != secondaryModules.cend(); ++it) {
        const QString &key = it.key();
        if (key.isEmpty() || taken(key))
            continue;
        if (key.startsWith(QLatin1String("oat"), Qt::CaseInsensitive)
            && taken(QString(key).remove(QLatin1String("oat"), Qt::CaseInsensitive)))
            continue;
        const QSharedPointer<_TestModule> replaced = testModules.value(key);
        if (replaced)
            --names[replaced->moduleName.toLower()];
        testModules.insert(key, it.value());
        ++names[it.value()->moduleName.toLower()];
    }
}

QSharedPointer<_TestModule> Manifest::CreateTestModuleFromLog(const QString &logPath)
{
    for (const ModuleKind &kind : ModuleKinds()) {
        if (kind.readsLog && kind.readsLog(logPath))
            return kind.createModule();
    }
    return {};
}
