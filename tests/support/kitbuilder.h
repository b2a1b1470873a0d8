#pragma once

// Builds test kits on disk for tests, demos and benchmarks: module
// description files of every kind, "package" folders holding ".kestix"
// packages, and "testframeworks" folders with "run" packages. The packages
// and their module information files are made by the package helpers of
// support/handsetfixture.h (testutil::ModuleSpec, BuildMif, WritePackage), so
// a kit built here also installs and runs on the emulated handset.
//
// Typical use:
//
//     QTemporaryDir dir;
//     kitbuilder::KitBuilder kit(dir.path() + "/kit");
//     kitbuilder::Module audio;
//     audio.kind = "ctf";
//     audio.name = "AudioPlay";
//     audio.testCases = {"t1", "t2"};
//     audio.package.classIds = {0x01020304};
//     audio.package.programs = {{"AudioPlay_k", "-v"}};
//     audio.package.behaviour = "...";   // what the emulated handset runs
//     kit.AddSourceModule("tests/multimedia/audio", audio);  // description, src/, package/
//     kit.AddFrameworkPackage("testframeworks", "ctf", "Win32", "Debug");
//     ASSERT_TRUE(kit.Ok()) << kit.Errors().join("\n").toStdString();
//
// Every Add... returns the full path of what it wrote, or an empty string on
// failure; the failure is also recorded in Errors(). Relative paths are taken
// below Root(); parent folders are created as needed.

#include "support/handsetfixture.h"

#include <QByteArray>
#include <QString>
#include <QStringList>

namespace kitbuilder {

// A module as a kit ships it.
struct Module
{
    // "ctf", "ctfapplet", "oat", "uitf" or "secondary": selects the
    // description file name ("ctfmodule.xml", "ctfappletmodule.xml",
    // "oatmodule.xml", "utmodule.xml", "secondarymodule.xml").
    QString kind = QStringLiteral("ctf");
    QString name;
    QString family;            // written only when not empty
    QString subFamily;         // written only when not empty
    QStringList testCases;     // "testcase" elements with TYPE "auto"
    QString minKestoVersion;   // "minkestover", when not empty
    QStringList secondaryModules; // one "secondary_modules" element each
    // Packages, one per "<tool-chain>_<build>" pair, named
    // "<name>_<tool-chain>_<build>.kestix".
    QStringList variants{QStringLiteral("Win32_Debug"), QStringLiteral("RVCT22arm9_Release")};
    // What every package holds; an empty directory stands for the module's
    // name, so the module information file is "<name>/<name>.mif".
    testutil::ModuleSpec package;
};

// "ctfmodule.xml" and so on for a kind word; empty for an unknown kind.
QString DescriptionFileName(const QString &kind);

// The description XML of module: a "module" document element whose first
// child is "suite" with the upper-case attributes NAME, FAMILY, SUBFAMILY.
QByteArray MakeDescription(const Module &module);

class KitBuilder
{
public:
    // Creates the root folder.
    explicit KitBuilder(const QString &root);

    QString Root() const { return m_root; }
    // The cleaned path of relative below the root.
    QString Path(const QString &relative) const;
    bool Ok() const { return m_errors.isEmpty(); }
    QStringList Errors() const { return m_errors; }

    QString AddFile(const QString &relative, const QByteArray &bytes = QByteArray());
    QString AddDirectory(const QString &relative);

    // Writes the module's description file into folder.
    QString AddDescription(const QString &folder, const Module &module);

    // Writes folder/<baseName>.kestix holding members in order.
    QString AddPackage(const QString &folder, const QString &baseName, const testutil::Members &members);

    // Writes every package of module into folder; returns the folder.
    QString AddModulePackages(const QString &folder, const Module &module);

    // A module built from sources: folder/<description>, folder/src/ with a
    // source file, and folder/package/ with the module's packages. Returns
    // the description's path.
    QString AddSourceModule(const QString &folder, const Module &module);

    // A module shipped prebuilt: folder/<description> beside
    // folder/<name>.dll. Returns the description's path.
    QString AddPrebuiltModule(const QString &folder, const Module &module);

    // A framework package <testframeworks>/run/<name>_<toolChain>_<build>.kestix
    // holding layout (by default "<name>/<name>.mif" listing the framework's
    // own class ID for the known names "ctf", "ctfapplet", "uitf" and "oat").
    QString AddFrameworkPackage(const QString &testframeworks, const QString &name,
                                const QString &toolChain, const QString &build,
                                const testutil::ModuleSpec *layout = nullptr);

private:
    QString Fail(const QString &message);

    QString m_root;
    QStringList m_errors;
};

} // namespace kitbuilder
