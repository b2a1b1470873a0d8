// Building a catalogue by scanning kits made at test time.

#include "manifest_fixture.h"

#include "catalogue/framework.h"
#include "modules/ctfapplettestmodule.h"
#include "modules/ctftestmodule.h"
#include "modules/oatframework.h"
#include "modules/oattestmodule.h"
#include "modules/secondarymodule.h"
#include "modules/uttestmodule.h"

#include <QFile>
#include <QFileInfo>

#include <unistd.h>

namespace {

using kitbuilder::Module;

class ManifestScanTest : public ManifestFixture
{
};

TEST_F(ManifestScanTest, FrameworkPackagesInRunFolderGiveFrameworksWithVariantsAndClassIds)
{
    kit->AddSourceModule(QStringLiteral("tests/a"), MakeModule(QStringLiteral("ctf"), QStringLiteral("A")));
    kit->AddFrameworkPackage(QStringLiteral("testframeworks"), QStringLiteral("oat"), QStringLiteral("RVCT22arm9"), QStringLiteral("Release"));
    kit->AddFrameworkPackage(QStringLiteral("testframeworks"), QStringLiteral("ctf"), QStringLiteral("Win32"), QStringLiteral("Debug"));
    kit->AddFrameworkPackage(QStringLiteral("testframeworks"), QStringLiteral("ctf"), QStringLiteral("RVCT22arm9"), QStringLiteral("Release"));
    kit->AddFrameworkPackage(QStringLiteral("testframeworks"), QStringLiteral("mine"), QStringLiteral("armgcc"), QStringLiteral("Debug"));
    // Not packages, or names that do not split into three parts.
    kit->AddFile(QStringLiteral("testframeworks/run/readme.txt"), "x");
    kit->AddFile(QStringLiteral("testframeworks/run/bad_name.kestix"), "x");
    // With a "run" folder, kind-named folders do not count.
    kit->AddDirectory(QStringLiteral("testframeworks/uitf"));

    Manifest manifest(kit->Root(), false);
    Scan(manifest);

    EXPECT_EQ(manifest.frameworks.keys(), (QStringList{"ctf", "mine", "oat"}));
    const QSharedPointer<_Framework> oat = manifest.frameworks.value(QStringLiteral("oat"));
    ASSERT_TRUE(oat);
    EXPECT_TRUE(oat.dynamicCast<_OatFramework>());
    EXPECT_EQ(oat->name, QStringLiteral("oat"));
    EXPECT_EQ(oat->classId, 0x0107556Bu);
    ASSERT_EQ(oat->variants.size(), 1);
    const QSharedPointer<_CompilerVariant> variant = oat->variants.first();
    EXPECT_EQ(variant->name, QStringLiteral("oat_RVCT22arm9_Release"));
    EXPECT_EQ(variant->variant, QStringLiteral("RVCT22arm9"));
    EXPECT_EQ(variant->build, QStringLiteral("Release"));
    EXPECT_EQ(variant->arch, IKestoDevice::PLATFORM_ARM);
    EXPECT_EQ(variant->packagePath, kit->Path(QStringLiteral("testframeworks/run/oat_RVCT22arm9_Release.kestix")));

    const QSharedPointer<_Framework> ctf = manifest.frameworks.value(QStringLiteral("ctf"));
    EXPECT_FALSE(ctf.dynamicCast<_OatFramework>());
    EXPECT_EQ(ctf->classId, 0x0102F2AAu);
    ASSERT_EQ(ctf->variants.size(), 2);
    EXPECT_EQ(ctf->variants.value(QStringLiteral("ctf_Win32_Debug"))->arch, IKestoDevice::PLATFORM_WIN32);
    EXPECT_EQ(manifest.frameworks.value(QStringLiteral("mine"))->classId, 0u);
    EXPECT_EQ(manifest.frameworks.value(QStringLiteral("mine"))->variants.first()->arch, IKestoDevice::PLATFORM_ARM);
}

TEST_F(ManifestScanTest, KindFoldersOfTestframeworksGivePlainFrameworksWithoutVariants)
{
    kit->AddSourceModule(QStringLiteral("tests/a"), MakeModule(QStringLiteral("ctf"), QStringLiteral("A")));
    for (const char *folder : {"oat", "CTF", "ctfapplet", "tools", "uitf2"})
        kit->AddDirectory(QStringLiteral("TestFrameworks/") + QLatin1String(folder));
    // A description inside a kit's testframeworks folder is not a module.
    kit->AddSourceModule(QStringLiteral("TestFrameworks/oat/selftest"), MakeModule(QStringLiteral("oat"), QStringLiteral("Hidden")));

    Manifest manifest(kit->Root(), false);
    Scan(manifest);

    EXPECT_EQ(manifest.frameworks.keys(), (QStringList{"ctf", "ctfapplet", "oat"}));
    for (const auto &framework : std::as_const(manifest.frameworks)) {
        EXPECT_EQ(framework->classId, 0u) << framework->name.toStdString();
        EXPECT_TRUE(framework->variants.isEmpty());
        EXPECT_FALSE(framework.dynamicCast<_OatFramework>());
    }
    EXPECT_FALSE(manifest.FindTestModule(QStringLiteral("hidden")));
}

TEST_F(ManifestScanTest, PlatformManifestWalksTestframeworksLikeAnyFolder)
{
    kit->AddSourceModule(QStringLiteral("testframeworks/ctf/selftest"), MakeModule(QStringLiteral("ctf"), QStringLiteral("SelfTest")));
    kit->AddFrameworkPackage(QStringLiteral("testframeworks"), QStringLiteral("ctf"), QStringLiteral("Win32"), QStringLiteral("Debug"));

    Manifest manifest(kit->Root(), true);
    Scan(manifest);

    EXPECT_TRUE(manifest.frameworks.isEmpty());
    const auto module = manifest.FindTestModule(QStringLiteral("selftest"));
    ASSERT_TRUE(module);
    EXPECT_EQ(module->source, QStringLiteral("PVS"));
    EXPECT_EQ(module->family, QStringLiteral("testframeworks"));
    EXPECT_EQ(module->subFamily, QStringLiteral("ctf"));
}

TEST_F(ManifestScanTest, FamiliesComeFromTheDescriptionOrElseFromThePath)
{
    kit->AddSourceModule(QStringLiteral("tests/multimedia/audio"), MakeModule(QStringLiteral("ctf"), QStringLiteral("Audio")));
    kit->AddSourceModule(QStringLiteral("API/Tests/net/socket/v2"), MakeModule(QStringLiteral("uitf"), QStringLiteral("Socket")));
    Module own = MakeModule(QStringLiteral("oat"), QStringLiteral("Own"));
    own.family = QStringLiteral("Telephony");
    own.subFamily = QStringLiteral("Calls");
    kit->AddSourceModule(QStringLiteral("tests/media/own"), own);
    kit->AddSourceModule(QStringLiteral("tests/Shallow"), MakeModule(QStringLiteral("ctfapplet"), QStringLiteral("Shallow")));
    kit->AddSourceModule(QStringLiteral("tests"), MakeModule(QStringLiteral("ctf"), QStringLiteral("Top")));

    Manifest manifest(kit->Root(), false);
    Scan(manifest);

    const auto family = [&](const char *name) {
        const auto module = manifest.FindTestModule(QLatin1String(name));
        return module ? module->family + QLatin1Char('/') + module->subFamily : QStringLiteral("missing");
    };
    EXPECT_EQ(family("audio"), QStringLiteral("multimedia/audio"));
    EXPECT_EQ(family("socket"), QStringLiteral("net/socket"));
    EXPECT_EQ(family("own"), QStringLiteral("Telephony/Calls"));
    // One folder below the skipped words: the file name is the second part.
    EXPECT_EQ(family("shallow"), QStringLiteral("Shallow/ctfappletmodule.xml"));
    EXPECT_EQ(family("top"), QStringLiteral("/"));
    EXPECT_EQ(manifest.FindTestModule(QStringLiteral("audio"))->source, QStringLiteral("KVK"));
}

TEST_F(ManifestScanTest, FirstDescriptionOfANameWinsAndLaterOnesAddTheirPackageTargets)
{
    Module first = MakeModule(QStringLiteral("ctf"), QStringLiteral("Dup"));
    first.variants = {QStringLiteral("Win32_Debug")};
    Module second = MakeModule(QStringLiteral("ctf"), QStringLiteral("DUP"));
    second.family = QStringLiteral("Other");
    second.testCases = {QStringLiteral("other")};
    second.variants = {QStringLiteral("RVCT22arm9_Release")};
    Module third = MakeModule(QStringLiteral("uitf"), QStringLiteral("Dup"));
    third.variants = {QStringLiteral("Win32_Debug")};
    kit->AddSourceModule(QStringLiteral("tests/a_win32/dup"), first);
    kit->AddSourceModule(QStringLiteral("tests/b_arm/dup"), second);
    kit->AddSourceModule(QStringLiteral("tests/c_again/dup"), third);

    Manifest manifest(kit->Root(), false);
    Scan(manifest);

    ASSERT_EQ(manifest.testModules.size(), 1);
    const auto module = manifest.testModules.value(QStringLiteral("dup"));
    ASSERT_TRUE(module.dynamicCast<CtfTestModule>());
    EXPECT_EQ(module->moduleName, QStringLiteral("Dup"));
    EXPECT_EQ(module->family, QStringLiteral("a_win32"));
    EXPECT_EQ(module->subFamily, QStringLiteral("dup"));
    ASSERT_EQ(module->testCases.size(), 2);
    EXPECT_EQ(module->testCases.first().name, QStringLiteral("Dup_1"));
    EXPECT_EQ(module->targets.keys(), (QStringList{"DUP_RVCT22arm9_Release", "Dup_Win32_Debug"}));
    // A target of a name already known keeps its first package.
    EXPECT_EQ(module->targets.value(QStringLiteral("Dup_Win32_Debug"))->packagePath,
              kit->Path(QStringLiteral("tests/a_win32/dup/package/Dup_Win32_Debug.kestix")));
}

TEST_F(ManifestScanTest, SourceModulesGetTargetsAndPrebuiltOnesDoNot)
{
    Module source = MakeModule(QStringLiteral("ctf"), QStringLiteral("FromSource"));
    source.package.classIds = {0x01234567, 0x01234568};
    source.package.appletIds = {0x0ABCDEF0};
    kit->AddSourceModule(QStringLiteral("tests/x/source"), source);
    kit->AddPrebuiltModule(QStringLiteral("tests/x/prebuilt"), MakeModule(QStringLiteral("ctf"), QStringLiteral("Prebuilt")));
    // A package folder beside prebuilt binaries is not looked at for targets.
    kit->AddModulePackages(QStringLiteral("tests/x/prebuilt/package"), MakeModule(QStringLiteral("ctf"), QStringLiteral("Prebuilt")));

    Manifest manifest(kit->Root(), false);
    Scan(manifest);

    const auto built = manifest.FindTestModule(QStringLiteral("fromsource"));
    ASSERT_TRUE(built);
    EXPECT_EQ(built->sourcePath, kit->Path(QStringLiteral("tests/x/source")));
    EXPECT_EQ(built->targets.keys(), (QStringList{"FromSource_RVCT22arm9_Release", "FromSource_Win32_Debug"}));
    EXPECT_EQ(built->targets.value(QStringLiteral("FromSource_Win32_Debug"))->arch, IKestoDevice::PLATFORM_WIN32);
    EXPECT_EQ(built->classids, (QVector<unsigned int>{0x01234567, 0x01234568}));
    ASSERT_EQ(built->applets.size(), 1);
    EXPECT_EQ(built->applets[0].appletid, 0x0ABCDEF0u);

    const auto prebuilt = manifest.FindTestModule(QStringLiteral("prebuilt"));
    ASSERT_TRUE(prebuilt);
    EXPECT_TRUE(prebuilt->targets.isEmpty());
    EXPECT_TRUE(prebuilt->sourcePath.isEmpty());
}

// The last entry in name order that says "source" or "prebuilt" decides.
struct KindCase
{
    const char *entry;
    bool isDirectory;
    bool expectSource;
};

class ManifestKindTest : public ManifestFixture, public ::testing::WithParamInterface<KindCase>
{
};

TEST_P(ManifestKindTest, LastClassifyingEntryDecides)
{
    const KindCase &kind = GetParam();
    Module module = MakeModule(QStringLiteral("ctf"), QStringLiteral("Mixed"));
    kit->AddDescription(QStringLiteral("tests/m/mixed"), module);
    kit->AddModulePackages(QStringLiteral("tests/m/mixed/package"), module);
    if (kind.isDirectory)
        kit->AddDirectory(QStringLiteral("tests/m/mixed/") + QLatin1String(kind.entry));
    else
        kit->AddFile(QStringLiteral("tests/m/mixed/") + QLatin1String(kind.entry), "x");
    kit->AddFile(QStringLiteral("tests/m/mixed/m.MOD"), "x");

    Manifest manifest(kit->Root(), false);
    Scan(manifest);
    const auto found = manifest.FindTestModule(QStringLiteral("mixed"));
    ASSERT_TRUE(found);
    EXPECT_EQ(!found->targets.isEmpty(), kind.expectSource);
    EXPECT_EQ(!found->sourcePath.isEmpty(), true) << "a source entry was seen in every case";
}

INSTANTIATE_TEST_SUITE_P(Entries, ManifestKindTest,
                         ::testing::Values(KindCase{"src", true, true},         // "src" after "m.MOD"
                                           KindCase{"a.c", false, false},       // before it
                                           KindCase{"Include", true, false},    // "include" < "m.mod"
                                           KindCase{"z_inc", true, true}));

TEST_F(ManifestScanTest, OatModulesFindTheirBaseLineFile)
{
    kit->AddSourceModule(QStringLiteral("tests/oat/with"), MakeModule(QStringLiteral("oat"), QStringLiteral("With")));
    kit->AddFile(QStringLiteral("tests/oat/with/With.BaseLine"), "base");
    kit->AddSourceModule(QStringLiteral("tests/oat/without"), MakeModule(QStringLiteral("oat"), QStringLiteral("Without")));
    kit->AddFile(QStringLiteral("tests/oat/without/zzz.txt"), "x");

    Manifest manifest(kit->Root(), false);
    Scan(manifest);

    EXPECT_EQ(manifest.FindTestModule(QStringLiteral("with"))->baseLineFile,
              kit->Path(QStringLiteral("tests/oat/with/With.BaseLine")));
    const auto without = manifest.FindTestModule(QStringLiteral("without"));
    EXPECT_TRUE(without->baseLineFile.isEmpty());
    EXPECT_FALSE(without->targets.isEmpty());
}

TEST_F(ManifestScanTest, SecondaryModulesAreMovedInOnlyWhenNoModuleTakesTheirName)
{
    kit->AddSourceModule(QStringLiteral("tests/foo"), MakeModule(QStringLiteral("ctf"), QStringLiteral("Foo")));
    kit->AddModulePackages(QStringLiteral("libs/helper/package"), MakeModule(QStringLiteral("ctf"), QStringLiteral("HelperLib")));
    kit->AddModulePackages(QStringLiteral("libs/oatfoo/package"), MakeModule(QStringLiteral("ctf"), QStringLiteral("OATFoo")));
    kit->AddModulePackages(QStringLiteral("libs/oatbar/package"), MakeModule(QStringLiteral("ctf"), QStringLiteral("oatBar")));
    kit->AddPackage(QStringLiteral("libs/nameless/package"), QStringLiteral("short_name"), {});
    Module described = MakeModule(QStringLiteral("secondary"), QStringLiteral("Described"));
    kit->AddSourceModule(QStringLiteral("libs/described"), described);

    Manifest manifest(kit->Root(), false);
    Scan(manifest);

    EXPECT_TRUE(manifest.secondaryModules.contains(QStringLiteral("HelperLib")));
    EXPECT_TRUE(manifest.secondaryModules.contains(QStringLiteral("")));
    EXPECT_TRUE(manifest.secondaryModules.contains(QStringLiteral("Foo")));
    EXPECT_EQ(manifest.testModules.keys(),
              (QStringList{"HelperLib", "described", "foo", "oatBar"}));
    // The moved-in module keeps its package's records and targets.
    const auto helper = manifest.FindTestModule(QStringLiteral("helperlib"));
    ASSERT_TRUE(helper);
    EXPECT_TRUE(helper.dynamicCast<SecondaryModule>());
    EXPECT_EQ(helper->targets.size(), 2);
    EXPECT_FALSE(manifest.FindTestModule(QStringLiteral("oatfoo")));
    EXPECT_TRUE(manifest.FindTestModule(QStringLiteral("Foo")).dynamicCast<CtfTestModule>());

    // Never offered for selection, whatever the pattern.
    QList<QSharedPointer<_TestModule>> selected;
    EXPECT_EQ(manifest.GetTestModules(selected, {}, QString(), QString()), 1u);
    EXPECT_EQ(Names(selected), QStringList{"Foo"});
    selected.clear();
    EXPECT_EQ(manifest.GetTestModules(selected, {QStringLiteral("*e*"), QStringLiteral("oatbar")}, QString(), QString()), 0u);
}

TEST_F(ManifestScanTest, ModuleInformationComesFromTheFirstMatchingMemberThatLoads)
{
    Module module = MakeModule(QStringLiteral("ctf"), QStringLiteral("Mif"));
    module.variants = {QStringLiteral("Win32_Debug")};
    module.package.directory = QStringLiteral("Mif");
    module.package.classIds = {0x0101};
    // Members that must not be taken: another module's file, and a file of
    // the right name that is not a resource file, ahead of the real one.
    testutil::ModuleSpec other;
    other.classIds = {0x0202};
    kit->AddDescription(QStringLiteral("tests/mif"), module);
    kit->AddDirectory(QStringLiteral("tests/mif/src"));
    kit->AddPackage(QStringLiteral("tests/mif/package"), QStringLiteral("Mif_Win32_Debug"),
                    {{QStringLiteral("Other/Other.mif"), testutil::BuildMif(other)},
                     {QStringLiteral("Mif/MIF.MIF.bak"), QByteArray("not a resource file")},
                     {QStringLiteral("Mif/Mif.mif"), testutil::BuildMif(module.package)}});
    // A package that is not an archive, and one cut short, are refused with
    // their reason: neither becomes a target.
    kit->AddFile(QStringLiteral("tests/mif/package/Mif_armgcc_Release.kestix"), QByteArray(700, 'x'));
    const QString good = kit->Path(QStringLiteral("tests/mif/package/Mif_Win32_Debug.kestix"));
    kit->AddFile(QStringLiteral("tests/mif/package/Mif_Win32_Release.kestix"), testutil::ReadFile(good).left(1500));

    Manifest manifest(kit->Root(), false);
    Scan(manifest);

    const auto found = manifest.FindTestModule(QStringLiteral("mif"));
    ASSERT_TRUE(found);
    EXPECT_EQ(found->classids, QVector<unsigned int>{0x0101});
    EXPECT_EQ(found->targets.keys(), QStringList{QStringLiteral("Mif_Win32_Debug")});
    const QString log = LogText();
    EXPECT_TRUE(log.contains(QStringLiteral("Manifest::ProcessPackageDir refused %1: does not look like a tar archive\n")
                                 .arg(kit->Path(QStringLiteral("tests/mif/package/Mif_armgcc_Release.kestix")))))
        << log.toStdString();
    EXPECT_TRUE(log.contains(QStringLiteral("Mif_Win32_Release.kestix: unexpected end of archive at offset 1500\n")))
        << log.toStdString();
}

TEST_F(ManifestScanTest, ASymbolicLinkLoopIsWalkedOnce)
{
    kit->AddSourceModule(QStringLiteral("tests/a/loopy"), MakeModule(QStringLiteral("ctf"), QStringLiteral("Loopy")));
    kit->AddModulePackages(QStringLiteral("libs/helper/package"), MakeModule(QStringLiteral("ctf"), QStringLiteral("Helper")));
    ASSERT_EQ(symlink("../..", kit->Path(QStringLiteral("tests/a/up")).toLocal8Bit().constData()), 0);
    ASSERT_EQ(symlink(".", kit->Path(QStringLiteral("tests/a/loopy/self")).toLocal8Bit().constData()), 0);

    Manifest manifest(kit->Root(), false);
    Scan(manifest);

    EXPECT_EQ(manifest.testModules.keys(), (QStringList{"Helper", "loopy"}));
    EXPECT_EQ(manifest.FindTestModule(QStringLiteral("loopy"))->family, QStringLiteral("a"));
    // Found once, on its own path, not again through the loop.
    for (const auto &target : std::as_const(manifest.FindTestModule(QStringLiteral("helper"))->targets))
        EXPECT_TRUE(target->packagePath.startsWith(kit->Path(QStringLiteral("libs/helper/package/"))))
            << target->packagePath.toStdString();
}

TEST_F(ManifestScanTest, BrokenAndMisnamedInputIsSkippedWithoutStoppingTheWalk)
{
    kit->AddFile(QStringLiteral("tests/broken/ctfmodule.xml"), "<module><suite NAME='Broken'>");
    kit->AddFile(QStringLiteral("tests/nosuite/ctfmodule.xml"), "<module><other NAME='NoSuite'/></module>");
    kit->AddFile(QStringLiteral("tests/notes/notes.xml"), "<notes/>");
    kit->AddSourceModule(QStringLiteral("tests/zgood"), MakeModule(QStringLiteral("uitf"), QStringLiteral("Good")));

    Manifest manifest(kit->Root(), false);
    Scan(manifest);

    EXPECT_EQ(manifest.testModules.keys(), QStringList{"good"});
    EXPECT_TRUE(manifest.FindTestModule(QStringLiteral("good")).dynamicCast<UTTestModule>());
}

TEST_F(ManifestScanTest, CurrentCacheIsReadInsteadOfScanning)
{
    kit->AddSourceModule(QStringLiteral("tests/a/first"), MakeModule(QStringLiteral("ctf"), QStringLiteral("First")));
    {
        Manifest manifest(kit->Root(), false);
        Scan(manifest);
    }
    kit->AddSourceModule(QStringLiteral("tests/a/second"), MakeModule(QStringLiteral("ctf"), QStringLiteral("Second")));

    Manifest cached(kit->Root(), false);
    ASSERT_TRUE(cached.GenerateManifest(false));
    EXPECT_EQ(cached.testModules.keys(), QStringList{"first"});

    Manifest rescanned(kit->Root(), false);
    ASSERT_TRUE(rescanned.GenerateManifest(true));
    EXPECT_EQ(rescanned.testModules.keys(), (QStringList{"first", "second"}));
}

struct LogCase
{
    const char *path;
    const char *type; // empty: no module
};

class ManifestLogKindTest : public ::testing::TestWithParam<LogCase>
{
};

TEST_P(ManifestLogKindTest, ModuleKindFollowsTheLogName)
{
    const auto module = Manifest::CreateTestModuleFromLog(QLatin1String(GetParam().path));
    if (*GetParam().type == '\0') {
        EXPECT_FALSE(module);
        return;
    }
    ASSERT_TRUE(module);
    EXPECT_EQ(module->TestType(), QLatin1String(GetParam().type));
    EXPECT_TRUE(module->moduleName.isEmpty());
}

INSTANTIATE_TEST_SUITE_P(Names, ManifestLogKindTest,
                         ::testing::Values(LogCase{"Run-CTF-1.LOG", "ctf"},
                                           LogCase{"/logs/Timer-ctf-2026.log", "ctf"},
                                           LogCase{"run.log", "ctfapplet"},
                                           LogCase{"result.TXT", "uitf"},
                                           LogCase{"/a/b.xml", "uitf"},
                                           LogCase{"module.oat", "oat"},
                                           LogCase{"x.bin", ""},
                                           LogCase{"noextension", ""}));

} // namespace
