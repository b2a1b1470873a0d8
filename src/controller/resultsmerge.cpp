#include "controller/resultsmerge.h"

#include "catalogue/testcase.h"
#include "catalogue/testmodule.h"
#include "common/xmlnode.h"
#include "controller/processedresults.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>

#include <memory>

namespace {

const QString kUnexecuted = QStringLiteral("unexecuted");

// The handset whose folder holds a processed-results file at its usual
// place, or empty.
QString HandsetOf(const QString &path)
{
    const QStringList parts = QDir::cleanPath(QFileInfo(path).absoluteFilePath()).split(QLatin1Char('/'));
    const qsizetype n = parts.size();
    if (n < 5 || parts.at(n - 5) != QLatin1String("Targets") || parts.at(n - 3) != QLatin1String("Logs")
        || parts.at(n - 2) != QLatin1String("ProcessedResults"))
        return QString();
    const QByteArray bytes = QByteArray::fromPercentEncoding(parts.at(n - 4).toLatin1());
    const QString text = QString::fromUtf8(bytes);
    // Names of Latin-1 characters only are stored in Latin-1.
    return text.contains(QChar::ReplacementCharacter) ? QString::fromLatin1(bytes) : text;
}

QString JoinDistinct(const QString &list, const QString &item)
{
    if (item.isEmpty())
        return list;
    if (list.isEmpty())
        return item;
    return list.split(QStringLiteral(", ")).contains(item) ? list : list + QStringLiteral(", ") + item;
}

} // namespace

QString ResultsMerge::Key(const QString &name, const QString &source)
{
    return source + QLatin1Char('/') + name.toLower();
}

qsizetype ResultsMerge::Find(const QString &name, const QString &source) const
{
    const qsizetype exact = m_index.value(Key(name, source), -1);
    if (exact >= 0)
        return exact;
    // A module added to a file from a log has no source: it is the module
    // of that name.
    for (const qsizetype i : m_byName.value(name.toLower())) {
        if (source.isEmpty() || m_rows.at(i).source.isEmpty())
            return i;
    }
    return -1;
}

void ResultsMerge::Merge(const Row &row)
{
    const qsizetype index = Find(row.name, row.source);
    if (index < 0) {
        m_index.insert(Key(row.name, row.source), m_rows.size());
        m_byName[row.name.toLower()].append(m_rows.size());
        m_rows.append(row);
        return;
    }
    Row &merged = m_rows[index];
    if (merged.source.isEmpty() && !row.source.isEmpty()) {
        merged.source = row.source;
        m_index.insert(Key(merged.name, merged.source), index);
    }
    if (merged.family.isEmpty())
        merged.family = row.family;
    if (merged.subFamily.isEmpty())
        merged.subFamily = row.subFamily;
    merged.host = JoinDistinct(merged.host, row.host);
    merged.handset = JoinDistinct(merged.handset, row.handset);
    for (const auto &testCase : row.testCases) {
        bool found = false;
        for (auto &stored : merged.testCases) {
            if (stored.first == testCase.first) {
                stored.second = ProcessedResults::Precedence(stored.second, testCase.second);
                found = true;
                break;
            }
        }
        if (!found)
            merged.testCases.append(testCase);
    }
}

bool ResultsMerge::Add(const QString &path, const QString &handset, const QString &host)
{
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly)) {
        m_error = QStringLiteral("cannot open %1: %2").arg(path, file.errorString());
        return false;
    }
    if (file.size() > kMaxFileSize) {
        m_error = QStringLiteral("%1 is too large for a processed-results file (%2 bytes)").arg(path).arg(file.size());
        return false;
    }
    XmlParseError parseError;
    const std::unique_ptr<XmlNode> root = XmlNode::Parse(file.readAll(), &parseError);
    if (!root) {
        m_error = QStringLiteral("%1 is not a processed-results file: %2 (line %3, column %4)")
                      .arg(path, parseError.message)
                      .arg(parseError.line)
                      .arg(parseError.column);
        return false;
    }
    if (root->Name().toLower() != QLatin1String("testmodules")) {
        m_error = QStringLiteral("%1 is not a processed-results file (its root is <%2>)").arg(path, root->Name());
        return false;
    }
    const QString kitHash = root->Attribute(QStringLiteral("kvkHash"));
    if (!kitHash.isEmpty() && !m_kitHash.isEmpty() && kitHash != m_kitHash) {
        m_error = QStringLiteral("%1 was made for another test kit (kvkHash %2) than %3 (kvkHash %4)")
                      .arg(path, kitHash, m_kitHashFile, m_kitHash);
        return false;
    }

    ModuleTimings timings;
    const QString timingsPath = ModuleTimings::PathBeside(path);
    if (QFileInfo::exists(timingsPath) && !timings.Read(timingsPath)) {
        m_error = timings.ErrorString();
        return false;
    }
    const QString fileHandset = handset.isEmpty() ? HandsetOf(path) : handset;

    QList<Row> rows;
    for (const XmlNode *module : root->ChildElements()) {
        if (module->Name().toLower() != QLatin1String("module"))
            continue;
        Row row;
        row.name = module->Attribute(QStringLiteral("name"));
        row.source = module->Attribute(QStringLiteral("source"));
        row.family = module->Attribute(QStringLiteral("family"));
        row.subFamily = module->Attribute(QStringLiteral("subfamily"));
        for (const XmlNode *testCase : module->ChildElements()) {
            if (testCase->Name().toLower() != QLatin1String("testcase"))
                continue;
            const QString result = testCase->Attribute(QStringLiteral("result"));
            row.testCases.append({testCase->Attribute(QStringLiteral("name")), result});
            row.ran = row.ran || result != kUnexecuted;
        }
        if (!row.ran || row.name.isEmpty())
            continue;
        const QList<ModuleTimings::Run> runs = timings.Runs(row.name, row.source);
        row.handset = runs.isEmpty() || runs.last().handset.isEmpty() ? fileHandset : runs.last().handset;
        row.host = runs.isEmpty() || runs.last().host.isEmpty() ? host : runs.last().host;
        rows.append(row);
    }
    for (const Row &row : std::as_const(rows))
        Merge(row);
    m_timings.Merge(timings);
    if (m_kitHash.isEmpty() && !kitHash.isEmpty()) {
        m_kitHash = kitHash;
        m_kitHashFile = path;
    }
    m_error.clear();
    return true;
}

void ResultsMerge::Expect(const QList<Expected> &selection)
{
    m_expected = selection;
}

QList<ResultsMerge::Expected> ResultsMerge::ExpectedOf(const QList<QSharedPointer<_TestModule>> &selection)
{
    QList<Expected> expected;
    for (const QSharedPointer<_TestModule> &module : selection) {
        if (!module)
            continue;
        QStringList testCases;
        for (const TestCase &testCase : std::as_const(module->testCases))
            testCases.append(testCase.name);
        expected.append({module->moduleName, module->Source(), module->family, module->subFamily, testCases});
    }
    return expected;
}

QList<ResultsMerge::Row> ResultsMerge::Rows() const
{
    QList<Row> rows;
    QList<bool> taken(m_rows.size(), false);
    QHash<QString, bool> listed;
    for (const Expected &expected : m_expected) {
        const QString key = Key(expected.name, expected.source);
        if (listed.contains(key))
            continue;
        listed.insert(key, true);
        const qsizetype index = Find(expected.name, expected.source);
        if (index >= 0 && !taken.at(index)) {
            taken[index] = true;
            rows.append(m_rows.at(index));
            continue;
        }
        Row row;
        row.name = expected.name;
        row.source = expected.source;
        row.family = expected.family;
        row.subFamily = expected.subFamily;
        for (const QString &testCase : expected.testCases)
            row.testCases.append({testCase, kUnexecuted});
        rows.append(row);
    }
    for (qsizetype i = 0; i < m_rows.size(); ++i) {
        if (!taken.at(i))
            rows.append(m_rows.at(i));
    }
    return rows;
}

QStringList ResultsMerge::NotRun() const
{
    QStringList names;
    for (const Row &row : Rows()) {
        if (!row.ran)
            names.append(row.name);
    }
    return names;
}
