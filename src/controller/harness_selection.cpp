// The kit and platform catalogues, test selection and catalogue export.

#include "controller/harness.h"

#include "catalogue/manifest.h"
#include "catalogue/testmodule.h"
#include "controller/environmentkeys.h"

#include <QDir>
#include <QDomDocument>
#include <QFile>
#include <QFileInfo>
#include <QSet>

namespace {

const QString kGenerating = QStringLiteral("Generating manifest for ");
const QString kNotGenerated = QStringLiteral("Manifest %1 could not be generated.");
const QString kDefaultDevicePack = QStringLiteral("/testframeworks/oat/tools/reference/deviceref.dso");

// The "testModule" attributes of every "feature" element, at any depth, in
// document order; features counts the elements. The walk keeps no stack of
// its own, so a deeply nested file cannot exhaust the call stack.
void CollectFeatures(const QDomDocument &document, QStringList &names, int &features)
{
    const QDomElement root = document.documentElement();
    QDomElement element = root;
    while (!element.isNull()) {
        if (element.tagName().toLower() == QLatin1String("feature")) {
            ++features;
            const QString name = element.attribute(QStringLiteral("testModule"));
            if (!name.isEmpty())
                names.append(name);
        }
        QDomElement next = element.firstChildElement();
        while (next.isNull() && element != root) {
            next = element.nextSiblingElement();
            if (next.isNull())
                element = element.parentNode().toElement();
        }
        element = next;
    }
}

} // namespace

bool Harness::Setup()
{
    return SetupEnvironment() && SetupManifest();
}

bool Harness::GenerateCatalogue(Manifest &catalogue, bool force, const QString &path)
{
    if (catalogue.GenerateManifest(force))
        return true;
    // A scan that found modules serves this run even when its cache cannot
    // be written (a full disk, a cache folder that is not one).
    if (!catalogue.testModules.isEmpty()) {
        LogMessage(QStringLiteral("Manifest %1 could not be cached; the catalogue just scanned is used.").arg(path),
                   true);
        return true;
    }
    LogMessage(kNotGenerated.arg(path), true);
    return false;
}

bool Harness::SetupManifest()
{
    bool kitReady = true;
    const QString kit = GetTestkit();
    if (!m_kitManifest && !kit.isEmpty()) {
        kitReady = false;
        m_kitManifest.reset(new Manifest(kit, false));
        m_kitManifest->SetLogger(m_logger);
        const bool current = m_kitManifest->IsVersionOkay();
        if (current && m_kitManifest->ReadManifest()) {
            kitReady = true;
        } else {
            if (!current)
                LogMessage(QStringLiteral("Manifest out of date for ") + kit, true);
            LogMessage(kGenerating + kit, true);
            kitReady = GenerateCatalogue(*m_kitManifest, true, kit);
            if (!kitReady)
                m_kitManifest.reset();
        }
    }

    const QString platform = GetPlatform();
    if (m_platformManifest || platform.isEmpty())
        return true;

    m_platformManifest.reset(new Manifest(platform, true));
    m_platformManifest->SetLogger(m_logger);
    bool platformReady = m_platformManifest->ReadManifest();
    if (!platformReady) {
        LogMessage(kGenerating + platform, true);
        platformReady = GenerateCatalogue(*m_platformManifest, false, platform);
        if (!platformReady)
            m_platformManifest.reset();
    }

    if (!m_environment.contains(EnvironmentKey::DevicePack)) {
        LogMessage(QStringLiteral("Using the default device pack."), true);
        SetDPK(platform + kDefaultDevicePack);
    }
    return kitReady || platformReady;
}

unsigned int Harness::GetTestModules(QList<QSharedPointer<_TestModule>> &modules, const QStringList &names,
                                     const QString &family, const QString &subFamily)
{
    if (Setup()) {
        if (m_kitManifest && !m_kitNotSelected)
            m_kitManifest->GetTestModules(modules, names, family, subFamily);
        if (m_platformManifest)
            m_platformManifest->GetTestModules(modules, names, family, subFamily);
    }
    return unsigned(modules.size());
}

unsigned int Harness::GetTestModules(QList<QSharedPointer<_TestModule>> &modules, const QString &featureFile)
{
    modules.clear();
    QFile file(featureFile);
    if (!file.open(QIODevice::ReadOnly)) {
        LogMessage(QStringLiteral("BFS File %1 not found.").arg(featureFile), true);
        return 0;
    }

    QDomDocument document;
    QString error;
    int line = 0;
    int column = 0;
    if (!document.setContent(&file, &error, &line, &column)) {
        LogMessage(QStringLiteral("Error Parsing BFS File %1, Error:%2 Line:%3 Column:%4")
                       .arg(featureFile, error)
                       .arg(line)
                       .arg(column),
                   true);
        return 0;
    }

    QStringList names;
    int features = 0;
    CollectFeatures(document, names, features);
    if (features == 0) {
        LogMessage(QStringLiteral("No testcases in BFS File %1.").arg(featureFile), true);
        return 0;
    }
    if (!Setup())
        return 0;

    if (!names.isEmpty()) {
        if (m_kitManifest && !m_kitNotSelected)
            m_kitManifest->GetTestModules(modules, names, QString(), QString());
        if (m_platformManifest)
            m_platformManifest->GetTestModules(modules, names, QString(), QString());
    }

    QSet<QString> found;
    for (const QSharedPointer<_TestModule> &module : modules)
        found.insert(module->moduleName.toLower());
    for (const QString &name : names) {
        if (!found.contains(name.toLower())) {
            LogMessage(QStringLiteral("   Warning: Testmodule \"%1\" not found in test manifests.").arg(name), true);
        }
    }
    return unsigned(modules.size());
}

bool Harness::WriteGeneratedManifest(Manifest &manifest, const QString &setting, const QString &outputPath,
                                     const QString &fallbackName)
{
    if (outputPath.isEmpty()) {
        LogMessage(QStringLiteral("Manifest written to ") + manifest.ManifestFilePath(), true);
        return true;
    }

    // Opened for appending, so an existing file is not emptied before the
    // catalogue is known to be written.
    const QIODevice::OpenMode probeMode = QIODevice::WriteOnly | QIODevice::Append;
    QString path = outputPath;
    QFile probe(path);
    if (!probe.open(probeMode)) {
        QString name = QFileInfo(outputPath).fileName();
        if (name.isEmpty())
            name = fallbackName;
        path = QDir::cleanPath(QDir::homePath() + QDir::separator() + name);
        probe.setFileName(path);
        if (!probe.open(probeMode)) {
            LogMessage(QStringLiteral("Manifest can't be opened for writing."), true);
            return false;
        }
    }
    probe.close();
    if (!manifest.WriteManifest(path))
        return false;
    LogMessage(QStringLiteral("Manifest ") + setting + QStringLiteral(" written to ") + path, true);
    return true;
}

bool Harness::GenerateManifest(const QString &outputPath)
{
    const bool kitGiven = !GetTestkit().isEmpty();
    const bool platformGiven = !GetPlatform().isEmpty();
    if (!SetupEnvironment())
        return false;

    m_kitManifest.reset();
    m_platformManifest.reset();

    QString output = outputPath;
    if (!output.isEmpty()) {
        if (QDir::isRelativePath(output))
            output = QDir::cleanPath(QDir::currentPath() + QDir::separator() + output);
        QDir().mkpath(QFileInfo(output).absolutePath());
    }

    // Scans one catalogue afresh and writes it; a failed scan leaves the
    // Harness without that catalogue.
    const auto generate = [&](QSharedPointer<Manifest> &catalogue, const QString &setting, bool isPlatform,
                              const QString &fallbackName) {
        catalogue.reset(new Manifest(setting, isPlatform));
        catalogue->SetLogger(m_logger);
        LogMessage(kGenerating + setting, true);
        if (!catalogue->GenerateManifest(true)) {
            catalogue.reset();
            return false;
        }
        return WriteGeneratedManifest(*catalogue, setting, output, fallbackName);
    };

    bool written = false;
    const QString kit = GetTestkit();
    if (kitGiven && !kit.isEmpty())
        written = generate(m_kitManifest, kit, false, QStringLiteral("KVKManifest.xml"));
    const QString platform = GetPlatform();
    if (platformGiven && !platform.isEmpty())
        written = generate(m_platformManifest, platform, true, QStringLiteral("PlatformManifest.xml")) || written;
    return written;
}
