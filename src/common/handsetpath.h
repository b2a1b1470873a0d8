#pragma once

#include "export.h"

#include <QString>

// The one mapping between handset paths ("fs:/a/b") and host paths inside an
// emulated handset's folder (<handset>/fs/a/b). Every handset file operation
// goes through it, so that no host file outside the handset is ever read,
// written or removed through a handset path.
namespace HandsetPath {

// The prefix of every handset path.
inline constexpr char kPrefix[] = "fs:/";

// The folder that holds a handset's file system: <handsetFolder>/fs, cleaned.
HARNESS_EXPORT QString FsFolder(const QString &handsetFolder);

// The cleaned handset path: "fs:/a//b/../c/" gives "fs:/a/c", "fs:/" stays
// "fs:/". Empty when the path does not start with "fs:/", holds a NUL
// character or climbs above "fs:/" ("fs:/../x").
HARNESS_EXPORT QString Clean(const QString &handsetPath);

// The host path of a handset path inside handsetFolder. Empty (refused) when
// Clean refuses the path, or when the part of the host path that exists,
// with every symbolic link resolved, lies outside the handset's fs folder
// (a dangling link on the way is refused as well, since writing through it
// could create a file anywhere).
HARNESS_EXPORT QString ToHost(const QString &handsetFolder, const QString &handsetPath);

// The handset path ("fs:/...") of a host path inside the handset's fs folder,
// compared lexically after cleaning; empty when it lies outside.
HARNESS_EXPORT QString FromHost(const QString &handsetFolder, const QString &hostPath);

} // namespace HandsetPath
