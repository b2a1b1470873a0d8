#include "controller/processedresults.h"

#include "catalogue/manifest.h"
#include "catalogue/testmodule.h"
#include "common/xmlwriter.h"
#include "log/log.h"

#include <QDateTime>
#include <QDir>
#include <QFile>
#include <QFileInfo>

namespace {

const QString kRootElement = QStringLiteral("testmodules");
const QString kModuleElement = QStringLiteral("module");
const QString kTestCaseElement = QStringLiteral("testcase");
const QString kKvkHash = QStringLiteral("kvkHash");
const QString kPlatformHash = QStringLiteral("platformHash");
const QString kIdHash = QStringLiteral("id_hash");
const QString kName = QStringLiteral("name");
const QString kFamily = QStringLiteral("family");
const QString kSubFamily = QStringLiteral("subfamily");
const QString kSource = QStringLiteral("source");
const QString kResult = QStringLiteral("result");

const QString kPass = QStringLiteral("pass");
const QString kFail = QStringLiteral("fail");
const QString kUnsupported = QStringLiteral("unsupported");
const QString kUnexecuted = QStringLiteral("unexecuted");

// Endings under which a log may report a test case stored without them.
const QString kRenamedEndings[] = {QStringLiteral(".1"), QStringLiteral("_1")};

bool IsElement(const QDomElement &element, const QString &name)
{
    return element.tagName().toLower() == name;
}

QString RootHashOf(Manifest *catalogue)
{
    return catalogue ? catalogue->RootHash() : QString();
}

} // namespace

// One "module" element with the index of its test cases: for every name,
// the "testcase" elements of that name in the order of the module's
// children (a sequence number tells their order apart across names).
struct ProcessedResults::Module
{
    struct Case
    {
        QDomElement element;
        quint64 order = 0;
    };

    QDomElement element;
    bool casesIndexed = false;
    quint64 nextOrder = 0;
    QHash<QString, QList<Case>> cases;

    void AddCase(const QDomElement &testCase)
    {
        cases[testCase.attribute(kName)].append(Case{testCase, nextOrder++});
    }

    void RemoveCase(const QString &name, const QDomElement &testCase)
    {
        auto found = cases.find(name);
        if (found == cases.end())
            return;
        QList<Case> &list = found.value();
        for (int i = 0; i < list.size(); ++i) {
            if (list.at(i).element == testCase) {
                list.removeAt(i);
                break;
            }
        }
        if (list.isEmpty())
            cases.erase(found);
    }
};

ProcessedResults::ProcessedResults() = default;
ProcessedResults::~ProcessedResults() = default;

void ProcessedResults::LogMessage(const QString &message)
{
    if (m_logger)
        m_logger->LogMessage(message, true);
}

QString ProcessedResults::Precedence(const QString &stored, const QString &reported)
{
    if (stored.isEmpty())
        return reported;
    if (stored == kPass)
        return stored;
    if (reported == kPass)
        return reported;
    if (stored == kFail)
        return reported == kUnsupported ? reported : stored;
    return reported == kUnexecuted ? stored : reported;
}

void ProcessedResults::Open(const QString &path, Manifest *kit, Manifest *platform, Log *logger)
{
    m_path = path;
    m_logger = logger;
    m_document = QDomDocument();
    m_root = QDomElement();
    m_index.clear();
    m_modified = false;
    m_damaged = false;
    savePending = false;

    bool usable = false;
    QFile file(path);
    if (!path.isEmpty() && file.exists()) {
        if (file.open(QIODevice::ReadOnly) && m_document.setContent(&file)) {
            m_root = m_document.documentElement();
            usable = !m_root.isNull() && IsElement(m_root, kRootElement);
        }
        // Whatever stands there and is not a results file is kept aside
        // rather than overwritten.
        m_damaged = !usable;
    }

    if (!usable || m_root.attribute(kKvkHash) != RootHashOf(kit)
        || (platform && m_root.attribute(kPlatformHash) != platform->RootHash())) {
        Rebuild(kit, platform);
    }
    BuildIndex();
}

void ProcessedResults::Rebuild(Manifest *kit, Manifest *platform)
{
    m_document = QDomDocument();
    m_root = m_document.createElement(kRootElement);
    m_root.setAttribute(kKvkHash, RootHashOf(kit));
    m_root.setAttribute(kPlatformHash, RootHashOf(platform));
    m_document.appendChild(m_root);
    AddCatalogue(kit, QStringLiteral("KVK"));
    AddCatalogue(platform, QStringLiteral("PVS"));
    m_modified = true;
}

void ProcessedResults::AddCatalogue(Manifest *catalogue, const QString &source)
{
    if (!catalogue)
        return;
    QList<QSharedPointer<_TestModule>> modules;
    catalogue->GetTestModules(modules, QStringList(), QString(), QString());
    for (const QSharedPointer<_TestModule> &module : modules) {
        if (module->TestType() == QLatin1String("secondary")
            || module->family.toLower() == QLatin1String("testframeworks")) {
            continue;
        }
        QDomElement element = m_document.createElement(kModuleElement);
        element.setAttribute(kIdHash, module->IDHash());
        element.setAttribute(kName, module->moduleName);
        element.setAttribute(kFamily, module->family);
        element.setAttribute(kSubFamily, module->subFamily);
        element.setAttribute(kSource, source);
        for (const TestCase &testCase : module->testCases) {
            QDomElement child = m_document.createElement(kTestCaseElement);
            child.setAttribute(kName, testCase.name);
            child.setAttribute(kResult, kUnexecuted);
            element.appendChild(child);
        }
        m_root.appendChild(element);
    }
}

QSharedPointer<ProcessedResults::Module> ProcessedResults::IndexModule(const QDomElement &element)
{
    QSharedPointer<Module> module(new Module);
    module->element = element;
    return module;
}

void ProcessedResults::BuildIndex()
{
    m_index.clear();
    for (QDomElement element = m_root.firstChildElement(); !element.isNull();
         element = element.nextSiblingElement()) {
        if (!IsElement(element, kModuleElement) || !element.hasAttribute(kName)
            || !element.hasAttribute(kIdHash)) {
            continue;
        }
        const QString hash = element.attribute(kIdHash);
        const QString key = (hash.isEmpty() ? element.attribute(kName) : hash).toLower();
        m_index.insert(key, IndexModule(element));
    }
}

void ProcessedResults::IndexCases(Module &module)
{
    if (module.casesIndexed)
        return;
    for (QDomElement child = module.element.firstChildElement(); !child.isNull();
         child = child.nextSiblingElement()) {
        if (IsElement(child, kTestCaseElement))
            module.AddCase(child);
    }
    module.casesIndexed = true;
}

void ProcessedResults::Record(const QString &idHash, const QString &moduleName,
                              const QString &family, const QString &subFamily,
                              const QString &testCase, const QString &result)
{
    QSharedPointer<Module> module = m_index.value(idHash.toLower());
    if (!module)
        module = m_index.value(moduleName.toLower());
    if (!module) {
        QDomElement element = m_document.createElement(kModuleElement);
        element.setAttribute(kName, moduleName);
        element.setAttribute(kFamily, family);
        element.setAttribute(kSubFamily, subFamily);
        element.setAttribute(kIdHash, idHash);
        m_root.appendChild(element);
        module = IndexModule(element);
        m_index.insert(idHash.toLower(), module);
    }
    IndexCases(*module);

    // The first child in document order whose name is the reported name, or
    // the reported name without one of the renamed endings.
    const Module::Case *match = nullptr;
    QString matchedName;
    auto consider = [&](const QString &name) {
        const auto found = module->cases.constFind(name);
        if (found == module->cases.constEnd() || found->isEmpty())
            return;
        const Module::Case &first = found->first();
        if (!match || first.order < match->order) {
            match = &first;
            matchedName = name;
        }
    };
    consider(testCase);
    for (const QString &ending : kRenamedEndings) {
        if (testCase.endsWith(ending))
            consider(testCase.chopped(ending.size()));
    }

    if (!match) {
        QDomElement element = m_document.createElement(kTestCaseElement);
        element.setAttribute(kName, testCase);
        element.setAttribute(kResult, result);
        module->element.appendChild(element);
        module->AddCase(element);
    } else {
        QDomElement element = match->element;
        if (matchedName != testCase) {
            element.setAttribute(kName, testCase);
            module->element.appendChild(element);
            module->RemoveCase(matchedName, element);
            module->AddCase(element);
        }
        element.setAttribute(kResult, Precedence(element.attribute(kResult), result));
    }
    m_modified = true;
}

bool ProcessedResults::KeepDamagedFile()
{
    const QString stamp =
        QDateTime::currentDateTimeUtc().toString(QStringLiteral("yyyyMMdd-HHmmss"));
    QString aside = m_path + QStringLiteral(".unreadable-") + stamp;
    for (int n = 1; QFileInfo::exists(aside); ++n)
        aside = m_path + QStringLiteral(".unreadable-%1-%2").arg(stamp).arg(n);
    // A copy, not a move: should writing the new file fail, the old one is
    // still where it was.
    if (!QFile::copy(m_path, aside)) {
        LogMessage(QStringLiteral("Processed results file %1 could not be read and could not be "
                                  "kept aside; it is left as it is and the results are not "
                                  "saved.\n")
                       .arg(m_path));
        return false;
    }
    LogMessage(QStringLiteral("Processed results file %1 could not be read; it is kept as %2.\n")
                   .arg(m_path, aside));
    return true;
}

bool ProcessedResults::Save()
{
    if (!m_modified || m_path.isEmpty())
        return true;
    if (m_damaged && QFileInfo::exists(m_path)) {
        if (!KeepDamagedFile())
            return false;
    }
    m_damaged = false;

    const QString folder = QFileInfo(m_path).absolutePath();
    QString error;
    if (!QDir().mkpath(folder)
        || !XmlWriter::WriteDocument(m_document, m_path, 1, true, &error)) {
        LogMessage(QStringLiteral("Processed results file %1 could not be written. %2\n")
                       .arg(m_path, error));
        return false;
    }
    m_modified = false;
    return true;
}
