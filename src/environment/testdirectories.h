#pragma once

#include "../common/export.h"
#include "platforms.h"

#include <QString>

// Every host folder the library keeps its own files in. The base folder is
// KESTIX_DATA_ROOT when it is set and not empty, otherwise the user's generic
// data location; below it:
//   Norvane/TestManifests/<name>                 cached manifests
//   Norvane/TestDataCache/<name>.kar             compiled test data
//   Norvane/TestDataCache/DSOFiles/<name>.dso    flattened device packs
//   Norvane/TestDataCache/PerlScripts            copies of the OAT scripts
//   Norvane/Targets/<target>/Logs/...            per-handset logs and results
// Each function creates the folders it names (failures are ignored: callers
// find out when they write) and returns a cleaned path without a trailing
// separator.
class HARNESS_EXPORT TestDirectories
{
public:
    // The cache folder of the manifest named name.
    static QString GetManifestDirectory(const QString &name);
    // The folder of compiled test data and device packs.
    static QString GetTestDataPath();
    // The compiled test data name, as <name>.kar. Create the cache folder,
    // not the file.
    static QString GetTestDataCacheFilePath(const QString &name);
    // The flattened device pack name, as <name>.dso; creates its folder.
    static QString GetDSOCacheFilePath(const QString &name);

    // The handset's folder; the target name is percent-encoded into one safe
    // folder name ("My Phone:1" gives "My%20Phone%3A1").
    static QString GetTargetDirectory(const QString &target);
    // The handset's log folder.
    static QString GetLogDirectory(const QString &target);
    // <log directory>/ProcessedResults/ProcessedResults.xml; creates the
    // folders, never the file.
    static QString GetProcessResultsPath(const QString &target);

    // The folder of the OAT post-processing scripts. When it does not exist
    // yet it is created and filled with copies of the files in
    // KESTIX_TESTSET/testframeworks/oat/tools/bin; once it exists it is never
    // refreshed.
    static QString GetOatPerlScripts();

    // The professional platform whose name equals platformName (ignoring
    // case); otherwise the default professional platform; otherwise an empty
    // Platform.
    static Platform GenerateProPlatform(const QString &platformName);

private:
    TestDirectories();
    ~TestDirectories();
};

// An existing file for a possibly relative path: an absolute path as given;
// else the path relative to the current directory, then to the home
// directory, then beside referenceFile. Empty when none exists.
HARNESS_EXPORT QString ResolveXmlPath(const QString &path, const QString &referenceFile);

// The program that runs the file: the interpreter named by its "#!" line, or
// else perl, python3 or sh by its suffix (.pl, .py, .sh), looked up on PATH.
// Empty when the file does not exist or no program is found.
HARNESS_EXPORT QString FindAssociatedExecutable(const QString &file);
