#pragma once

// The program records that CTF and OAT modules keep: read from the module's
// package while a kit is scanned, and stored in the manifest as
// "programs"/"program" elements.

#include "../common/export.h"
#include "../resources/sysresource.h"

#include <QList>
#include <QString>

class XmlNode;

namespace Programs {

// The text of a program record's property; empty when it has none.
HARNESS_EXPORT QString PropertyText(const SysResource &program, const char *name);

// Appends every "program" of every "programs" child of element; returns how
// many were read.
HARNESS_EXPORT int ReadFromManifest(const XmlNode &element, QList<SysResource> &programs);

// Appends a "programs" child holding one "program" per record, when there are any.
HARNESS_EXPORT void WriteToManifest(XmlNode &element, QList<SysResource> &programs);

// Reads the program records of type programType from the module information
// file inside the module's package in directory. The package is looked for as
// <directory>/<module>_Win32_Debug.kestix, _Win32_Release.kestix,
// RVCT22arm9_Release.kestix, then the same with prefix (e.g. "ctf") before the
// module name. mifName, when given, receives the file name of the module
// information member. False when no package or member was found, or the
// package is a damaged archive (nothing is read from it then).
HARNESS_EXPORT bool ReadFromPackage(const QString &directory, const QString &moduleName, const QString &prefix,
                                    unsigned int programType, QList<SysResource> &programs, QString *mifName);

} // namespace Programs
