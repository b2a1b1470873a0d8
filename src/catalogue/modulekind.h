#pragma once

#include "../common/export.h"

#include <QList>
#include <QSharedPointer>
#include <QString>

class _Framework;
class _TestModule;

// What the catalogue knows of one kind of test module. The kinds themselves
// live above the catalogue; their table (modules/modulekinds.h) hands itself
// to the catalogue through SetModuleKinds when the library is loaded.
struct HARNESS_EXPORT ModuleKind
{
    // The kind's type word ("ctf", "ctfapplet", "oat", "uitf", "secondary").
    QString type;
    // The file name of the kind's module description ("ctfmodule.xml", ...).
    QString descriptionFile;
    // Class ID of the framework named after the type word; 0 when the kind
    // has no framework of its own.
    unsigned int frameworkClassId = 0;
    // Whether the kind's modules look for a ".baseline" file beside their
    // description.
    bool hasBaseLine = false;
    // Whether a "package" folder without a description gives a module of
    // this kind.
    bool fromPackageFolder = false;
    // An empty module of the kind.
    QSharedPointer<_TestModule> (*createModule)() = nullptr;
    // The framework named after the type word; null for a plain _Framework.
    QSharedPointer<_Framework> (*createFramework)() = nullptr;
    // Whether a saved log of this path is one the kind parses; null when the
    // kind writes no logs.
    bool (*readsLog)(const QString &logPath) = nullptr;
};

// The kinds, in the order in which a description file name or a log name is
// matched against them. Empty until SetModuleKinds has run.
HARNESS_EXPORT const QList<ModuleKind> &ModuleKinds();

// The first kind whose flag member is set; null when none.
HARNESS_EXPORT const ModuleKind *FindModuleKind(bool ModuleKind::*flag);

// The kind whose type word is exactly type; null when none.
HARNESS_EXPORT const ModuleKind *FindModuleKind(const QString &type);

// Installs the table of module kinds; kinds must outlive every catalogue.
HARNESS_EXPORT void SetModuleKinds(const QList<ModuleKind> *kinds);
