#pragma once

#include "../common/export.h"

#include <QList>
#include <QMap>
#include <QSharedPointer>
#include <QString>
#include <QStringList>

#include <memory>

class Log;
class XmlNode;
class _Framework;
class _TestModule;

// The catalogue of one test kit (or of one platform directory): the test
// modules and test frameworks it contains.
//
// Building the catalogue means walking the whole tree, so it is cached as
// "Manifest.xml" (format version 5) in a folder named after the kit's root
// hash below the manifest directory of TestDirectories. GenerateManifest reads
// that cache while it is current and otherwise scans the tree and rewrites it.
//
// Copies share their modules and frameworks with the original.
class HARNESS_EXPORT Manifest
{
public:
    // path is made absolute against the current directory and cleaned; the
    // cache folder is created at once.
    Manifest(const QString &path, bool isPlatform);
    ~Manifest();
    // Copies share the modules and frameworks of other.
    Manifest(const Manifest &other);
    // Shares the modules and frameworks of other, as a copy does.
    Manifest &operator=(const Manifest &other);

    // The message sink (not owned; null silences).
    void SetLogger(Log *logger);
    // Writes message to the logger, echoed when flag is set.
    void LogMessage(const QString &message, bool flag);

    // "#" + the decimal string hash of the cleaned absolute kit path.
    QString RootHash();
    // Both give the full path of the cached "Manifest.xml".
    QString ManifestFilePath();
    // See ManifestFilePath().
    QString ManifestCachePath();

    // Whether the cache file exists and carries format version 5 or later.
    // Empties the module map first.
    bool IsVersionOkay();
    // Loads the cache file into the module map (emptied first) and the
    // framework map. False when the file is missing, unreadable, malformed or
    // not a manifest. Entries of unknown type are skipped.
    bool ReadManifest();
    // Writes the catalogue to path, or to the cache file when path is empty,
    // in one piece: an existing file is replaced only by a complete one.
    // False, with a message, when there are no modules (nothing is written)
    // or the file cannot be written.
    bool WriteManifest(const QString &path);
    // Reads the cache when it is current and force is false; otherwise scans
    // the tree (adding to what the maps hold), moves the unclaimed secondary
    // modules in and writes the cache. Answers the read or write result.
    bool GenerateManifest(bool force);

    // The module whose name equals name, ignoring case; null when none.
    QSharedPointer<_TestModule> FindTestModule(const QString &name);
    // Appends the selectable modules that match to out (key order) and
    // returns out's size. With names, each name is a pattern whose leading
    // and trailing "*" are wild cards, compared ignoring case, and the family
    // filters are not used; without names, a non-empty family (and then a
    // non-empty sub-family) must be contained in the module's, ignoring case.
    unsigned int GetTestModules(QList<QSharedPointer<_TestModule>> &out, const QStringList &names,
                                const QString &family, const QString &subFamily);
    // Replaces out by every framework in key order; returns the count.
    unsigned int GetFrameworks(QList<QSharedPointer<_Framework>> &out);

    // An empty module of the kind whose log the file name suggests: "txt" and
    // "xml" give UT, "log" CTF when the path holds "-ctf-" (else CTF applet),
    // "oat" OAT; any other suffix a null pointer.
    static QSharedPointer<_TestModule> CreateTestModuleFromLog(const QString &logPath);

    // True for a platform's catalogue, false for a test kit's.
    bool isPlatform = false;
    // The message sink; not owned.
    Log *logger = nullptr;
    // The cleaned absolute path of the kit or platform.
    QString kitPath;
    // The folder of the cached catalogue.
    QString cacheDirectory;
    // The cached "Manifest.xml".
    QString cacheFile;
    // See RootHash().
    QString rootHash;
    // Keyed by lower-cased module name.
    QMap<QString, QSharedPointer<_TestModule>> testModules;
    // Found in "package" folders during a scan; keyed by name as written.
    QMap<QString, QSharedPointer<_TestModule>> secondaryModules;
    // Keyed by framework name as written.
    QMap<QString, QSharedPointer<_Framework>> frameworks;

    // An entry of a directory listed by a scan.
    struct DirEntry;

private:
    struct MifRecord;
    struct ScanState;

    void ProcessTheSubDir(const QString &dir);
    void ProcessFrameworkDirectory(const QString &dir);
    bool ProcessXMLDocument(const QString &path);
    void ProcessXMLDir(const QString &xmlPath, QSharedPointer<_TestModule> module);
    void ProcessSource(QSharedPointer<_TestModule> module, const QString &dir);
    void ProcessTarget(QSharedPointer<_TestModule> module, const QString &dir);
    void ProcessPackageDir(QSharedPointer<_TestModule> module, const QString &dir);
    void DecompileKestoPackage(QSharedPointer<_TestModule> module, const QString &package);
    void ProcessSecondaryModules();

    // Parses a cache file; null unless it is well-formed with a "testkit" root.
    static std::unique_ptr<XmlNode> ReadCacheDocument(const QString &path);
    // Whether a parsed cache carries a current format version.
    static bool IsCurrent(const XmlNode &root);
    // Fills the maps from a parsed cache.
    void ReadDocument(const XmlNode &root);

    // An empty module of the kind whose type word is type; null when none.
    static QSharedPointer<_TestModule> CreateModule(const QString &type);
    // An _OatFramework for "oat", else a plain _Framework.
    static QSharedPointer<_Framework> CreateFramework(const QString &name);

    // The listing of dir sorted by name, taken from the disk once per scan.
    QList<DirEntry> Listing(const QString &dir);
    // Forgets the listing of dir and the packages read from it.
    void ForgetListing(const QString &dir);
    // The module-information members of a package, read once per scan.
    // False, with a message the first time, when the package is a damaged
    // archive: the scan then takes nothing from it.
    bool PackageMifs(const QString &package, QList<MifRecord> &records);

    // Set only while GenerateManifest scans.
    ScanState *m_scan = nullptr;
};
