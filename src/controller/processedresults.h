#pragma once

#include "../common/export.h"

#include <QHash>
#include <QList>
#include <QSharedPointer>
#include <QString>

#include <memory>

class Log;
class Manifest;
class XmlNode;

// The processed-results file of one handset: every module of the kit and
// platform catalogues with the verdict of each of its test cases, kept
// across runs.
//
//   <testmodules kvkHash="#1" platformHash="#2">
//    <module id_hash="#3" name="Audio" family="media" subfamily="" source="KVK">
//     <testcase name="t1" result="pass"/>
//
// The document is held in memory with an index from module key (its
// "id_hash" lower-cased, or its "name" lower-cased when it has no hash) to
// its element, and per module an index of its test cases, so recording a
// verdict never walks the whole file.
class HARNESS_EXPORT ProcessedResults
{
public:
    ProcessedResults();
    ~ProcessedResults();
    ProcessedResults(const ProcessedResults &) = delete;
    ProcessedResults &operator=(const ProcessedResults &) = delete;

    // Reads path and rebuilds the skeleton from the catalogues (either may be
    // null) when the file is missing, unreadable or malformed, or was built
    // for other catalogues (another root hash); every test case of a rebuilt
    // skeleton is "unexecuted". A malformed file is not lost: Save keeps it
    // beside the new one.
    void Open(const QString &path, Manifest *kit, Manifest *platform, Log *logger);

    // Records one verdict of the module known by idHash (else by
    // moduleName, any letter case); an unknown module gets a new entry with
    // the given family and sub-family. A stored test case whose name is the
    // reported one without a ".1" or "_1" ending takes the reported name.
    void Record(const QString &idHash, const QString &moduleName, const QString &family, const QString &subFamily,
                const QString &testCase, const QString &result);

    // Writes the document when it was modified, atomically, through the
    // deterministic XML writer. A malformed file found by Open is first kept
    // as "<path>.unreadable-<time>"; when it cannot be kept, nothing is
    // written. False (with a message) when the file cannot be written.
    bool Save();

    // The verdict that stays when a test case stored as `stored` is reported
    // as `reported`: "pass" is never overturned, a new "pass" always wins,
    // "fail" only gives way to "unsupported", and "unexecuted" never
    // replaces a verdict.
    static QString Precedence(const QString &stored, const QString &reported);

    QString Path() const { return m_path; }
    bool IsModified() const { return m_modified; }
    // The root element of the document once Open has run, else null.
    const XmlNode *Root() const { return m_root.get(); }

    // Set by a caller that defers saving to a later point.
    bool savePending = false;

private:
    struct Module;

    void Rebuild(Manifest *kit, Manifest *platform);
    void AddCatalogue(Manifest *catalogue, const QString &source);
    void BuildIndex();
    QSharedPointer<Module> IndexModule(XmlNode *element);
    void IndexCases(Module &module);
    bool KeepDamagedFile();
    void LogMessage(const QString &message);

    QString m_path;
    Log *m_logger = nullptr;
    std::unique_ptr<XmlNode> m_root;
    QHash<QString, QSharedPointer<Module>> m_index;
    // The module of the last verdict recorded, and what it was asked by.
    Module *m_last = nullptr;
    QString m_lastIdHash;
    QString m_lastName;
    bool m_modified = false;
    // The file on disk could not be read as a results file.
    bool m_damaged = false;
};
