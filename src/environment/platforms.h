#pragma once

#include "../common/export.h"

#include <QList>
#include <QString>

// What is installed on the host: the platform SDKs and the test kits, found
// through the KESTIX_* environment variables. Every function reads the
// environment and the file system afresh; nothing is cached and nothing is
// logged. A variable that is not set reads as the empty string, a missing
// directory lists nothing.

// One installed platform: a sub-directory of KESTIX_PLATFORMS_ALL.
class HARNESS_EXPORT Platform
{
public:
    Platform();
    // Records copy member by member.
    Platform(const Platform &other);
    // Records copy member by member.
    Platform &operator=(const Platform &other);

    QString name; // directory name without its " pro" edition word
    QString path; // platforms root + separator + directory name as on disk
    bool isPro = false; // the directory name contains "pro" (any case)
    bool isDefault = false; // path names the platform of KESTIX_PLATFORM (case-insensitive)
};

// One installed test kit: a sub-directory of the test sets root.
class HARNESS_EXPORT TestKit
{
public:
    // The kind of a test kit.
    enum KitType { USER_KIT = 0, TEST_KIT = 1, PVS_KIT = 2 };

    TestKit();
    // Records copy member by member.
    TestKit(const TestKit &other);
    // Records copy member by member.
    TestKit &operator=(const TestKit &other);
    ~TestKit();

    // "User Kit", "Test Kit", "Pvs Kit", or "unknown" for any other value.
    static QString TypeToName(KitType type);

    QString name; // the kit directory's name
    QString path; // the cleaned path of the kit directory
    // The kit's kind.
    KitType type = USER_KIT;
    // Not used by the library; always false.
    bool reserved = false;
};

// Clears out, fills it with the platforms sorted by directory name and returns
// their number (0 when KESTIX_PLATFORMS_ALL is empty or unreadable).
HARNESS_EXPORT unsigned int GetPlatforms(QList<Platform> &out);

// Append the professional (respectively other) platforms to out, which is not
// cleared first; return the size of out afterwards.
HARNESS_EXPORT unsigned int GetProPlatforms(QList<Platform> &out);
HARNESS_EXPORT unsigned int GetNonProPlatforms(QList<Platform> &out);

// Sets out to the default platform's directory: KESTIX_PLATFORM up to its
// last backslash or, without one, its last forward slash (the whole value
// without either). False, with out empty, when KESTIX_PLATFORM is empty.
HARNESS_EXPORT bool GetDefaultPlatform(QString &out);

// Clears out, fills it with the test kits (type TEST_KIT) sorted by directory
// name and returns their number.
HARNESS_EXPORT unsigned int GetTestKits(QList<TestKit> &out);

// Picks the kit named by GetDefaultTestKitName into out, or the kit with the
// greatest name when that name is empty. False, with out unchanged, when no
// kit is installed or the named kit is not.
HARNESS_EXPORT bool GetDefaultTestKit(TestKit &out);

// The last path component of KESTIX_TESTSET (empty when it ends in a
// separator, the whole value when it has none).
HARNESS_EXPORT QString GetDefaultTestKitName();

// Splits a package file name such as "my_mod_RVCT22arm9_Release.kestix" into
// "my_mod", "RVCT22arm9" and "Release": ".kestix" is removed (any case), the
// last two "_"-separated parts become middle and last and the rest, joined by
// "_", first. False, with the outputs untouched, for fewer than three parts.
HARNESS_EXPORT bool BreakPackageName(const QString &package, QString &first, QString &middle, QString &last);

// The environment variables, as set.
HARNESS_EXPORT QString GetToolsetSetting(); // KESTIX_TOOLSET
HARNESS_EXPORT QString GetPlatformsRoot(); // KESTIX_PLATFORMS_ALL
HARNESS_EXPORT QString GetPlatformSetting(); // KESTIX_PLATFORM
HARNESS_EXPORT QString GetTestSetSetting(); // KESTIX_TESTSET
// KESTIX_TESTSETS_ALL, or when empty the "Tests" directory beside the
// platforms root.
HARNESS_EXPORT QString GetTestSetsRoot();
