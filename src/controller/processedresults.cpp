#include "controller/processedresults.h"

#include "catalogue/manifest.h"
#include "catalogue/testmodule.h"
#include "common/xmlnode.h"
#include "common/xmlwriter.h"
#include "log/log.h"

#include <QDateTime>
#include <QDir>
#include <QFile>
#include <QFileInfo>

#include <algorithm>
#include <string>
#include <vector>

namespace {

const QString kRootElement = QStringLiteral("testmodules");
// Levels of elements a results file may hold (it writes three).
constexpr int kMaxDepth = 64;
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

bool IsElement(const XmlNode &element, const QString &name)
{
    return element.Name().compare(name, Qt::CaseInsensitive) == 0;
}

QString RootHashOf(Manifest *catalogue)
{
    return catalogue ? catalogue->RootHash() : QString();
}

} // namespace

// One "module" element with the index of its test cases: every
// "testcase" element under its name, with a sequence number that follows
// the module's children (an element moved to the end takes a new one).
//
// The index is a vector sorted by name, then sequence, so the first case of
// a name is found by binary search and indexing a module of the file is one
// allocation and one sort. Cases added afterwards wait in a short unsorted
// tail that is merged in as it grows.
struct ProcessedResults::Module
{
    struct Case
    {
        QString name;
        XmlNode *element = nullptr;
        quint64 order = 0;

        bool operator<(const Case &other) const
        {
            if (NameBefore(name, other.name))
                return true;
            return !NameBefore(other.name, name) && order < other.order;
        }
    };

    // Any strict order groups equal names; length first, then the UTF-16
    // units, is the cheapest.
    static bool NameBefore(const QString &a, const QString &b)
    {
        if (a.size() != b.size())
            return a.size() < b.size();
        return std::char_traits<char16_t>::compare(reinterpret_cast<const char16_t *>(a.constData()),
                                                   reinterpret_cast<const char16_t *>(b.constData()), size_t(a.size()))
            < 0;
    }

    XmlNode *element = nullptr;
    bool casesIndexed = false;
    quint64 nextOrder = 0;
    std::vector<Case> sorted;
    std::vector<Case> tail;

    void Build()
    {
        sorted.reserve(element->Children().size());
        for (const auto &child : element->Children()) {
            if (child->IsElement() && IsElement(*child, kTestCaseElement))
                sorted.push_back(Case{child->Attribute(kName), child.get(), nextOrder++});
        }
        std::sort(sorted.begin(), sorted.end());
        casesIndexed = true;
    }

    // The cases of the sorted part named name (removed ones included).
    std::pair<std::vector<Case>::iterator, std::vector<Case>::iterator> Named(const QString &name)
    {
        const auto begin = std::lower_bound(sorted.begin(), sorted.end(), name,
                                            [](const Case &c, const QString &n) { return NameBefore(c.name, n); });
        auto end = begin;
        while (end != sorted.end() && end->name == name)
            ++end;
        return {begin, end};
    }

    // The case named name that comes first in the module, or null.
    const Case *First(const QString &name)
    {
        const Case *first = nullptr;
        const auto [begin, end] = Named(name);
        for (auto it = begin; it != end && !first; ++it) {
            if (it->element)
                first = &*it;
        }
        for (const Case &c : tail) {
            if (c.name == name && (!first || c.order < first->order))
                first = &c;
        }
        return first;
    }

    void AddCase(XmlNode *testCase)
    {
        tail.push_back(Case{testCase->Attribute(kName), testCase, nextOrder++});
        if (tail.size() < kTailSize)
            return;
        std::sort(tail.begin(), tail.end());
        const size_t middle = sorted.size();
        sorted.insert(sorted.end(), std::make_move_iterator(tail.begin()), std::make_move_iterator(tail.end()));
        std::inplace_merge(sorted.begin(), sorted.begin() + qsizetype(middle), sorted.end());
        tail.clear();
    }

    // A case leaves the sorted part as a blank entry, so that no rename
    // moves the rest of the index.
    void RemoveCase(const QString &name, const XmlNode *testCase)
    {
        const auto same = [testCase](const Case &c) {
            return c.element == testCase;
        };
        const auto inTail = std::find_if(tail.begin(), tail.end(), same);
        if (inTail != tail.end()) {
            tail.erase(inTail);
            return;
        }
        const auto [begin, end] = Named(name);
        const auto inSorted = std::find_if(begin, end, same);
        if (inSorted != end)
            inSorted->element = nullptr;
    }

    static constexpr size_t kTailSize = 32;
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
    m_index.clear();
    m_last = nullptr;
    m_root.reset();
    m_modified = false;
    m_damaged = false;
    savePending = false;

    bool usable = false;
    QFile file(path);
    if (!path.isEmpty() && file.exists()) {
        if (file.open(QIODevice::ReadOnly)) {
            m_root = XmlNode::Parse(file.readAll());
            // A file nested far deeper than results ever are is not one of
            // ours; written back with its indentation it would grow with
            // the square of its depth.
            usable = m_root && IsElement(*m_root, kRootElement) && m_root->Depth() <= kMaxDepth;
        }
        // Whatever stands there and is not a results file is kept aside
        // rather than overwritten.
        m_damaged = !usable;
    }

    if (!usable || m_root->Attribute(kKvkHash) != RootHashOf(kit)
        || (platform && m_root->Attribute(kPlatformHash) != platform->RootHash())) {
        Rebuild(kit, platform);
    }
    BuildIndex();
}

void ProcessedResults::Rebuild(Manifest *kit, Manifest *platform)
{
    m_root = std::make_unique<XmlNode>(kRootElement);
    m_root->SetAttribute(kKvkHash, RootHashOf(kit));
    m_root->SetAttribute(kPlatformHash, RootHashOf(platform));
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
        XmlNode &element = m_root->AppendElement(kModuleElement);
        element.SetAttribute(kIdHash, module->IDHash());
        element.SetAttribute(kName, module->moduleName);
        element.SetAttribute(kFamily, module->family);
        element.SetAttribute(kSubFamily, module->subFamily);
        element.SetAttribute(kSource, source);
        for (const TestCase &testCase : module->testCases) {
            XmlNode &child = element.AppendElement(kTestCaseElement);
            child.SetAttribute(kName, testCase.name);
            child.SetAttribute(kResult, kUnexecuted);
        }
    }
}

QSharedPointer<ProcessedResults::Module> ProcessedResults::IndexModule(XmlNode *element)
{
    QSharedPointer<Module> module(new Module);
    module->element = element;
    return module;
}

void ProcessedResults::BuildIndex()
{
    m_index.clear();
    for (const auto &child : m_root->Children()) {
        XmlNode *element = child.get();
        if (!element->IsElement() || !IsElement(*element, kModuleElement) || !element->HasAttribute(kName)
            || !element->HasAttribute(kIdHash)) {
            continue;
        }
        const QString hash = element->Attribute(kIdHash);
        const QString key = (hash.isEmpty() ? element->Attribute(kName) : hash).toLower();
        m_index.insert(key, IndexModule(element));
    }
}

void ProcessedResults::IndexCases(Module &module)
{
    if (!module.casesIndexed)
        module.Build();
}

void ProcessedResults::Record(const QString &idHash, const QString &moduleName, const QString &family,
                              const QString &subFamily, const QString &testCase, const QString &result)
{
    // The verdicts of one module come one after the other.
    Module *module = nullptr;
    if (m_last && idHash == m_lastIdHash && moduleName == m_lastName)
        module = m_last;
    else
        module = m_index.value(idHash.toLower()).data();
    if (!module)
        module = m_index.value(moduleName.toLower()).data();
    if (!module) {
        XmlNode &element = m_root->AppendElement(kModuleElement);
        element.SetAttribute(kName, moduleName);
        element.SetAttribute(kFamily, family);
        element.SetAttribute(kSubFamily, subFamily);
        element.SetAttribute(kIdHash, idHash);
        const QSharedPointer<Module> added = IndexModule(&element);
        m_index.insert(idHash.toLower(), added);
        module = added.data();
    }
    if (module != m_last) {
        m_last = module;
        m_lastIdHash = idHash;
        m_lastName = moduleName;
    }
    IndexCases(*module);

    // The first child in document order whose name is the reported name, or
    // the reported name without one of the renamed endings.
    const Module::Case *match = nullptr;
    QString matchedName;
    auto consider = [&](const QString &name) {
        const Module::Case *first = module->First(name);
        if (first && (!match || first->order < match->order)) {
            match = first;
            matchedName = name;
        }
    };
    consider(testCase);
    for (const QString &ending : kRenamedEndings) {
        if (testCase.endsWith(ending))
            consider(testCase.chopped(ending.size()));
    }

    if (!match) {
        XmlNode &element = module->element->AppendElement(kTestCaseElement);
        element.SetAttribute(kName, testCase);
        element.SetAttribute(kResult, result);
        module->AddCase(&element);
    } else {
        XmlNode *element = match->element;
        if (matchedName != testCase) {
            element->SetAttribute(kName, testCase);
            module->element->MoveToEnd(element);
            module->RemoveCase(matchedName, element);
            module->AddCase(element);
        }
        element->SetAttribute(kResult, Precedence(element->Attribute(kResult), result));
    }
    m_modified = true;
}

bool ProcessedResults::KeepDamagedFile()
{
    const QString stamp = QDateTime::currentDateTimeUtc().toString(QStringLiteral("yyyyMMdd-HHmmss"));
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
    LogMessage(QStringLiteral("Processed results file %1 could not be read; it is kept as %2.\n").arg(m_path, aside));
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
    if (!QDir().mkpath(folder) || !XmlWriter::WriteDocument(*m_root, m_path, 1, true, &error)) {
        LogMessage(QStringLiteral("Processed results file %1 could not be written. %2\n").arg(m_path, error));
        return false;
    }
    m_modified = false;
    return true;
}
