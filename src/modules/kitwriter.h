#pragma once

#include "../common/export.h"

#include <QByteArray>
#include <QList>
#include <QPair>
#include <QString>
#include <QStringList>
#include <QVector>

// Writes test kits on disk as the manifest scan reads them and the emulated
// handset runs them: module description files of every kind, "package"
// folders holding ".kestix" packages, and "testframeworks" folders with
// "run" packages. The demo environment of the tool and the tests' kits are
// written by it.
//
//   KitWriter kit(root);
//   KitModule audio;
//   audio.kind = "ctf";
//   audio.name = "AudioPlay";
//   audio.testCases = {"t1", "t2"};
//   audio.package.classIds = {0x01020304};
//   kit.AddSourceModule("tests/multimedia/audio", audio);
//   kit.AddFrameworkPackage("testframeworks", "ctf", "Win32", "Debug");
//   if (!kit.Ok()) ... kit.ErrorString() ...
//
// Every Add... returns the full path of what it wrote, or an empty string on
// failure; the failure is also recorded (Errors(), ErrorString()). Relative
// paths are taken below Root(); parent folders are created as needed.

// A program record (system resource of a program type) of a module
// information file.
struct HARNESS_EXPORT KitProgram
{
    QString name; // the key the program is started by
    QString arguments; // stored as "Arguments" when not empty
    unsigned int type = 0x0102FAF7;
};

using KitMembers = QList<QPair<QString, QByteArray>>;

// What a module's package holds: the members are placed below `directory`,
// the module's folder on the handset ("fs:/usermods/<directory>/").
struct HARNESS_EXPORT KitPackage
{
    QString directory;
    // Name of the module information file; directory + ".mif" when empty.
    QString mifName;
    QVector<unsigned int> classIds;
    QVector<unsigned int> appletIds;
    QList<KitProgram> programs;
    // OAT suite program records, keys "<vendor>:<suite>:<program name>".
    QStringList suitePrograms;
    // Text of the "behaviour" script the emulated handset runs; none when
    // empty.
    QByteArray behaviour;
    // Further members, names relative to directory.
    KitMembers files;

    // The bytes of the module information file listing the class IDs,
    // applets and program records.
    QByteArray Mif() const;
    // The package members: the .mif, the behaviour (when given) and the
    // further files, all below directory.
    KitMembers Members() const;
};

// A module as a kit ships it.
struct HARNESS_EXPORT KitModule
{
    // The module kind's type word; it selects the description file name.
    QString kind = QStringLiteral("ctf");
    QString name;
    QString family; // written only when not empty
    QString subFamily; // written only when not empty
    QStringList testCases; // "testcase" elements with TYPE "auto"
    QString minKestoVersion; // "minkestover", when not empty
    QStringList secondaryModules; // one "secondary_modules" element each
    // Packages, one per "<tool-chain>_<build>" pair, named
    // "<name>_<tool-chain>_<build>.kestix".
    QStringList variants{QStringLiteral("Win32_Debug"), QStringLiteral("RVCT22arm9_Release")};
    // What every package holds; an empty directory stands for the module's
    // name.
    KitPackage package;
    // The file that AddSourceModule writes into "src/", named after the
    // module.
    QByteArray source = QByteArrayLiteral("int main(void) { return 0; }\n");
};

class HARNESS_EXPORT KitWriter
{
public:
    // Creates the root folder.
    explicit KitWriter(const QString &root);

    // The description file name of a kind ("ctfmodule.xml", ...); empty for
    // an unknown kind.
    static QString DescriptionFileName(const QString &kind);
    // The description XML of module: a "module" document element whose first
    // child is "suite" with the upper-case attributes NAME, FAMILY, SUBFAMILY.
    static QByteArray Description(const KitModule &module);
    // Writes a tar package of members (names as given); false when it cannot
    // be written.
    static bool WritePackage(const QString &path, const KitMembers &members);

    QString Root() const { return m_root; }
    // The cleaned path of relative below the root.
    QString Path(const QString &relative) const;
    bool Ok() const { return m_errors.isEmpty(); }
    QStringList Errors() const { return m_errors; }
    // The first failure, empty when there is none.
    QString ErrorString() const { return m_errors.value(0); }

    QString AddFile(const QString &relative, const QByteArray &bytes = QByteArray(), bool executable = false);
    QString AddDirectory(const QString &relative);

    // Writes the module's description file into folder.
    QString AddDescription(const QString &folder, const KitModule &module);

    // Writes folder/<baseName>.kestix holding members in order.
    QString AddPackage(const QString &folder, const QString &baseName, const KitMembers &members);

    // Writes every package of module into folder; returns the folder.
    QString AddModulePackages(const QString &folder, const KitModule &module);

    // A module built from sources: folder/<description>, folder/src/ with a
    // source file, and folder/package/ with the module's packages. Returns
    // the description's path.
    QString AddSourceModule(const QString &folder, const KitModule &module);

    // A module shipped prebuilt: folder/<description> beside
    // folder/<name>.dll. Returns the description's path.
    QString AddPrebuiltModule(const QString &folder, const KitModule &module);

    // A framework package <testframeworks>/run/<name>_<toolChain>_<build>.kestix
    // holding layout (by default "<name>/<name>.mif" listing the class ID of
    // the framework of that name, when it is a known one).
    QString AddFrameworkPackage(const QString &testframeworks, const QString &name, const QString &toolChain,
                                const QString &build, const KitPackage *layout = nullptr);

private:
    QString Fail(const QString &message);

    QString m_root;
    QStringList m_errors;
};
