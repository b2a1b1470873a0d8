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

using namespace Qt::StringLiterals;

namespace {

using kitbuilder::Module;

using ManifestScanTest = ManifestFixture;

TEST_F(ManifestScanTest, FrameworkPackagesInRunFolderGiveFrameworksWithVariantsAndClassIds)
{
    kit->AddSourceModule(u"tests/a"_s, MakeModule(u"ctf"_s, u"A"_s));
    kit->AddFrameworkPackage(u"testframeworks"_s, u"oat"_s, u"RVCT22arm9"_s, u"Release"_s);
    kit->AddFrameworkPackage(u"testframeworks"_s, u"ctf"_s, u"Win32"_s, u"Debug"_s);
    kit->AddFrameworkPackage(u"testframeworks"_s, u"ctf"_s, u"RVCT22arm9"_s, u"Release"_s);
    kit->AddFrameworkPackage(u"testframeworks"_s, u"mine"_s, u"armgcc"_s, u"Debug"_s);
    // Not packages, or names that do not split into three parts.
    kit->AddFile(u"testframeworks/run/readme.txt"_s, "x");
    kit->AddFile(u"testframeworks/run/bad_name.kestix"_s, "x");
    // With a "run" folder, kind-named folders do not count.
    kit->AddDirectory(u"testframeworks/uitf"_s);

    Manifest manifest = ScanKit();

    EXPECT_EQ(manifest.frameworks.keys(), (QStringList{"ctf", "mine", "oat"}));
    const QSharedPointer<_Framework> oat = manifest.frameworks.value(u"oat"_s);
    ASSERT_TRUE(oat);
    EXPECT_TRUE(oat.dynamicCast<_OatFramework>());
    EXPECT_EQ(oat->name, u"oat"_s);
    EXPECT_EQ(oat->classId, 0x0107556Bu);
    ASSERT_EQ(oat->variants.size(), 1);
    const QSharedPointer<_CompilerVariant> variant = oat->variants.first();
    EXPECT_EQ(variant->name, u"oat_RVCT22arm9_Release"_s);
    EXPECT_EQ(variant->variant, u"RVCT22arm9"_s);
    EXPECT_EQ(variant->build, u"Release"_s);
    EXPECT_EQ(variant->arch, IKestoDevice::PLATFORM_ARM);
    EXPECT_EQ(variant->packagePath, kit->Path(u"testframeworks/run/oat_RVCT22arm9_Release.kestix"_s));

    const QSharedPointer<_Framework> ctf = manifest.frameworks.value(u"ctf"_s);
    EXPECT_FALSE(ctf.dynamicCast<_OatFramework>());
    EXPECT_EQ(ctf->classId, 0x0102F2AAu);
    ASSERT_EQ(ctf->variants.size(), 2);
    EXPECT_EQ(ctf->variants.value(u"ctf_Win32_Debug"_s)->arch, IKestoDevice::PLATFORM_WIN32);
    EXPECT_EQ(manifest.frameworks.value(u"mine"_s)->classId, 0u);
    EXPECT_EQ(manifest.frameworks.value(u"mine"_s)->variants.first()->arch, IKestoDevice::PLATFORM_ARM);
}

TEST_F(ManifestScanTest, KindFoldersOfTestframeworksGivePlainFrameworksWithoutVariants)
{
    kit->AddSourceModule(u"tests/a"_s, MakeModule(u"ctf"_s, u"A"_s));
    for (const char *folder : {"oat", "CTF", "ctfapplet", "tools", "uitf2"})
        kit->AddDirectory(u"TestFrameworks/"_s + QString::fromLatin1(folder));
    // A description inside a kit's testframeworks folder is not a module.
    kit->AddSourceModule(u"TestFrameworks/oat/selftest"_s, MakeModule(u"oat"_s, u"Hidden"_s));

    Manifest manifest = ScanKit();

    EXPECT_EQ(manifest.frameworks.keys(), (QStringList{"ctf", "ctfapplet", "oat"}));
    for (const auto &framework : std::as_const(manifest.frameworks)) {
        EXPECT_EQ(framework->classId, 0u) << framework->name.toStdString();
        EXPECT_TRUE(framework->variants.isEmpty());
        EXPECT_FALSE(framework.dynamicCast<_OatFramework>());
    }
    EXPECT_FALSE(manifest.FindTestModule(u"hidden"_s));
}

TEST_F(ManifestScanTest, PlatformManifestWalksTestframeworksLikeAnyFolder)
{
    kit->AddSourceModule(u"testframeworks/ctf/selftest"_s, MakeModule(u"ctf"_s, u"SelfTest"_s));
    kit->AddFrameworkPackage(u"testframeworks"_s, u"ctf"_s, u"Win32"_s, u"Debug"_s);

    Manifest manifest = ScanKit(true);

    EXPECT_TRUE(manifest.frameworks.isEmpty());
    const auto module = manifest.FindTestModule(u"selftest"_s);
    ASSERT_TRUE(module);
    EXPECT_EQ(module->source, u"PVS"_s);
    EXPECT_EQ(module->family, u"testframeworks"_s);
    EXPECT_EQ(module->subFamily, u"ctf"_s);
}

TEST_F(ManifestScanTest, FamiliesComeFromTheDescriptionOrElseFromThePath)
{
    kit->AddSourceModule(u"tests/multimedia/audio"_s, MakeModule(u"ctf"_s, u"Audio"_s));
    kit->AddSourceModule(u"API/Tests/net/socket/v2"_s, MakeModule(u"uitf"_s, u"Socket"_s));
    Module own = MakeModule(u"oat"_s, u"Own"_s);
    own.family = u"Telephony"_s;
    own.subFamily = u"Calls"_s;
    kit->AddSourceModule(u"tests/media/own"_s, own);
    kit->AddSourceModule(u"tests/Shallow"_s, MakeModule(u"ctfapplet"_s, u"Shallow"_s));
    kit->AddSourceModule(u"tests"_s, MakeModule(u"ctf"_s, u"Top"_s));

    Manifest manifest = ScanKit();

    const auto family = [&](const char *name) {
        const auto module = manifest.FindTestModule(QString::fromLatin1(name));
        return module ? module->family + u'/' + module->subFamily : u"missing"_s;
    };
    EXPECT_EQ(family("audio"), u"multimedia/audio"_s);
    EXPECT_EQ(family("socket"), u"net/socket"_s);
    EXPECT_EQ(family("own"), u"Telephony/Calls"_s);
    // One folder below the skipped words: the file name is the second part.
    EXPECT_EQ(family("shallow"), u"Shallow/ctfappletmodule.xml"_s);
    EXPECT_EQ(family("top"), u"/"_s);
    EXPECT_EQ(manifest.FindTestModule(u"audio"_s)->source, u"KVK"_s);
}

TEST_F(ManifestScanTest, FirstDescriptionOfANameWinsAndLaterOnesAddTheirPackageTargets)
{
    Module first = MakeModule(u"ctf"_s, u"Dup"_s);
    first.variants = {u"Win32_Debug"_s};
    Module second = MakeModule(u"ctf"_s, u"DUP"_s);
    second.family = u"Other"_s;
    second.testCases = {u"other"_s};
    second.variants = {u"RVCT22arm9_Release"_s};
    Module third = MakeModule(u"uitf"_s, u"Dup"_s);
    third.variants = {u"Win32_Debug"_s};
    kit->AddSourceModule(u"tests/a_win32/dup"_s, first);
    kit->AddSourceModule(u"tests/b_arm/dup"_s, second);
    kit->AddSourceModule(u"tests/c_again/dup"_s, third);

    Manifest manifest = ScanKit();

    ASSERT_EQ(manifest.testModules.size(), 1);
    const auto module = manifest.testModules.value(u"dup"_s);
    ASSERT_TRUE(module.dynamicCast<CtfTestModule>());
    EXPECT_EQ(module->moduleName, u"Dup"_s);
    EXPECT_EQ(module->family, u"a_win32"_s);
    EXPECT_EQ(module->subFamily, u"dup"_s);
    ASSERT_EQ(module->testCases.size(), 2);
    EXPECT_EQ(module->testCases.first().name, u"Dup_1"_s);
    EXPECT_EQ(module->targets.keys(), (QStringList{"DUP_RVCT22arm9_Release", "Dup_Win32_Debug"}));
    // A target of a name already known keeps its first package.
    EXPECT_EQ(module->targets.value(u"Dup_Win32_Debug"_s)->packagePath,
              kit->Path(u"tests/a_win32/dup/package/Dup_Win32_Debug.kestix"_s));
}

TEST_F(ManifestScanTest, SourceModulesGetTargetsAndPrebuiltOnesDoNot)
{
    Module source = MakeModule(u"ctf"_s, u"FromSource"_s);
    source.package.classIds = {0x01234567, 0x01234568};
    source.package.appletIds = {0x0ABCDEF0};
    kit->AddSourceModule(u"tests/x/source"_s, source);
    kit->AddPrebuiltModule(u"tests/x/prebuilt"_s, MakeModule(u"ctf"_s, u"Prebuilt"_s));
    // A package folder beside prebuilt binaries is not looked at for targets.
    kit->AddModulePackages(u"tests/x/prebuilt/package"_s, MakeModule(u"ctf"_s, u"Prebuilt"_s));

    Manifest manifest = ScanKit();

    const auto built = manifest.FindTestModule(u"fromsource"_s);
    ASSERT_TRUE(built);
    EXPECT_EQ(built->sourcePath, kit->Path(u"tests/x/source"_s));
    EXPECT_EQ(built->targets.keys(), (QStringList{"FromSource_RVCT22arm9_Release", "FromSource_Win32_Debug"}));
    EXPECT_EQ(built->targets.value(u"FromSource_Win32_Debug"_s)->arch, IKestoDevice::PLATFORM_WIN32);
    EXPECT_EQ(built->classids, (QVector<unsigned int>{0x01234567, 0x01234568}));
    ASSERT_EQ(built->applets.size(), 1);
    EXPECT_EQ(built->applets[0].appletid, 0x0ABCDEF0u);

    const auto prebuilt = manifest.FindTestModule(u"prebuilt"_s);
    ASSERT_TRUE(prebuilt);
    EXPECT_TRUE(prebuilt->targets.isEmpty());
    EXPECT_TRUE(prebuilt->sourcePath.isEmpty());
}

// The last entry in name order that says "source" or "prebuilt" decides.
TEST_F(ManifestScanTest, LastClassifyingEntryDecidesBetweenSourceAndPrebuilt)
{
    const struct
    {
        const char *entry;
        bool isDirectory;
        bool source;
    } rows[] = {
        {"src", true, true}, // "src" after "m.MOD"
        {"a.c", false, false}, // before it
        {"Include", true, false}, // "include" < "m.mod"
        {"z_inc", true, true},
    };
    for (int i = 0; i < 4; ++i) {
        const QString folder = u"tests/m/mixed%1"_s.arg(i);
        const Module module = MakeModule(u"ctf"_s, u"Mixed%1"_s.arg(i));
        kit->AddDescription(folder, module);
        kit->AddModulePackages(folder + u"/package"_s, module);
        if (rows[i].isDirectory)
            kit->AddDirectory(folder + u'/' + QString::fromLatin1(rows[i].entry));
        else
            kit->AddFile(folder + u'/' + QString::fromLatin1(rows[i].entry), "x");
        kit->AddFile(folder + u"/m.MOD"_s, "x");
    }
    Manifest manifest = ScanKit();
    for (int i = 0; i < 4; ++i) {
        const auto found = manifest.FindTestModule(u"mixed%1"_s.arg(i));
        ASSERT_TRUE(found) << rows[i].entry;
        EXPECT_EQ(!found->targets.isEmpty(), rows[i].source) << rows[i].entry;
        EXPECT_FALSE(found->sourcePath.isEmpty()) << "a source entry was seen in every case";
    }
}

TEST_F(ManifestScanTest, OatModulesFindTheirBaseLineFile)
{
    kit->AddSourceModule(u"tests/oat/with"_s, MakeModule(u"oat"_s, u"With"_s));
    kit->AddFile(u"tests/oat/with/With.BaseLine"_s, "base");
    kit->AddSourceModule(u"tests/oat/without"_s, MakeModule(u"oat"_s, u"Without"_s));
    kit->AddFile(u"tests/oat/without/zzz.txt"_s, "x");

    Manifest manifest = ScanKit();

    EXPECT_EQ(manifest.FindTestModule(u"with"_s)->baseLineFile, kit->Path(u"tests/oat/with/With.BaseLine"_s));
    const auto without = manifest.FindTestModule(u"without"_s);
    EXPECT_TRUE(without->baseLineFile.isEmpty());
    EXPECT_FALSE(without->targets.isEmpty());
}

TEST_F(ManifestScanTest, SecondaryModulesAreMovedInOnlyWhenNoModuleTakesTheirName)
{
    kit->AddSourceModule(u"tests/foo"_s, MakeModule(u"ctf"_s, u"Foo"_s));
    kit->AddModulePackages(u"libs/helper/package"_s, MakeModule(u"ctf"_s, u"HelperLib"_s));
    kit->AddModulePackages(u"libs/oatfoo/package"_s, MakeModule(u"ctf"_s, u"OATFoo"_s));
    kit->AddModulePackages(u"libs/oatbar/package"_s, MakeModule(u"ctf"_s, u"oatBar"_s));
    kit->AddPackage(u"libs/nameless/package"_s, u"short_name"_s, {});
    Module described = MakeModule(u"secondary"_s, u"Described"_s);
    kit->AddSourceModule(u"libs/described"_s, described);

    Manifest manifest = ScanKit();

    EXPECT_TRUE(manifest.secondaryModules.contains(u"HelperLib"_s));
    EXPECT_TRUE(manifest.secondaryModules.contains(u""_s));
    EXPECT_TRUE(manifest.secondaryModules.contains(u"Foo"_s));
    EXPECT_EQ(manifest.testModules.keys(), (QStringList{"HelperLib", "described", "foo", "oatBar"}));
    // The moved-in module keeps its package's records and targets.
    const auto helper = manifest.FindTestModule(u"helperlib"_s);
    ASSERT_TRUE(helper);
    EXPECT_TRUE(helper.dynamicCast<SecondaryModule>());
    EXPECT_EQ(helper->targets.size(), 2);
    EXPECT_FALSE(manifest.FindTestModule(u"oatfoo"_s));
    EXPECT_TRUE(manifest.FindTestModule(u"Foo"_s).dynamicCast<CtfTestModule>());

    // Never offered for selection, whatever the pattern.
    QList<QSharedPointer<_TestModule>> selected;
    EXPECT_EQ(manifest.GetTestModules(selected, {}, QString(), QString()), 1u);
    EXPECT_EQ(Names(selected), QStringList{"Foo"});
    selected.clear();
    EXPECT_EQ(manifest.GetTestModules(selected, {u"*e*"_s, u"oatbar"_s}, QString(), QString()), 0u);
}

TEST_F(ManifestScanTest, ModuleInformationComesFromTheFirstMatchingMemberThatLoads)
{
    Module module = MakeModule(u"ctf"_s, u"Mif"_s);
    module.variants = {u"Win32_Debug"_s};
    module.package.directory = u"Mif"_s;
    module.package.classIds = {0x0101};
    // Members that must not be taken: another module's file, and a file of
    // the right name that is not a resource file, ahead of the real one.
    testutil::ModuleSpec other;
    other.classIds = {0x0202};
    kit->AddDescription(u"tests/mif"_s, module);
    kit->AddDirectory(u"tests/mif/src"_s);
    kit->AddPackage(u"tests/mif/package"_s, u"Mif_Win32_Debug"_s,
                    {{u"Other/Other.mif"_s, testutil::BuildMif(other)},
                     {u"Mif/MIF.MIF.bak"_s, QByteArray("not a resource file")},
                     {u"Mif/Mif.mif"_s, testutil::BuildMif(module.package)}});
    // A package that is not an archive, and one cut short, are refused with
    // their reason: neither becomes a target.
    kit->AddFile(u"tests/mif/package/Mif_armgcc_Release.kestix"_s, QByteArray(700, 'x'));
    const QString good = kit->Path(u"tests/mif/package/Mif_Win32_Debug.kestix"_s);
    kit->AddFile(u"tests/mif/package/Mif_Win32_Release.kestix"_s, testutil::ReadFile(good).left(1500));

    Manifest manifest = ScanKit();

    const auto found = manifest.FindTestModule(u"mif"_s);
    ASSERT_TRUE(found);
    EXPECT_EQ(found->classids, QVector<unsigned int>{0x0101});
    EXPECT_EQ(found->targets.keys(), QStringList{u"Mif_Win32_Debug"_s});
    const QString log = LogText();
    EXPECT_TRUE(log.contains(u"Manifest::ProcessPackageDir refused %1: does not look like a tar archive\n"_s.arg(
        kit->Path(u"tests/mif/package/Mif_armgcc_Release.kestix"_s))))
        << log.toStdString();
    EXPECT_TRUE(log.contains(u"Mif_Win32_Release.kestix: unexpected end of archive at offset 1500\n"_s))
        << log.toStdString();
}

TEST_F(ManifestScanTest, ASymbolicLinkLoopIsWalkedOnce)
{
    kit->AddSourceModule(u"tests/a/loopy"_s, MakeModule(u"ctf"_s, u"Loopy"_s));
    kit->AddModulePackages(u"libs/helper/package"_s, MakeModule(u"ctf"_s, u"Helper"_s));
    ASSERT_EQ(symlink("../..", kit->Path(u"tests/a/up"_s).toLocal8Bit().constData()), 0);
    ASSERT_EQ(symlink(".", kit->Path(u"tests/a/loopy/self"_s).toLocal8Bit().constData()), 0);

    Manifest manifest = ScanKit();

    EXPECT_EQ(manifest.testModules.keys(), (QStringList{"Helper", "loopy"}));
    EXPECT_EQ(manifest.FindTestModule(u"loopy"_s)->family, u"a"_s);
    // Found once, on its own path, not again through the loop.
    for (const auto &target : std::as_const(manifest.FindTestModule(u"helper"_s)->targets))
        EXPECT_TRUE(target->packagePath.startsWith(kit->Path(u"libs/helper/package/"_s)))
            << target->packagePath.toStdString();
}

TEST_F(ManifestScanTest, BrokenAndMisnamedInputIsSkippedWithoutStoppingTheWalk)
{
    kit->AddFile(u"tests/broken/ctfmodule.xml"_s, "<module><suite NAME='Broken'>");
    kit->AddFile(u"tests/nosuite/ctfmodule.xml"_s, "<module><other NAME='NoSuite'/></module>");
    kit->AddFile(u"tests/notes/notes.xml"_s, "<notes/>");
    kit->AddSourceModule(u"tests/zgood"_s, MakeModule(u"uitf"_s, u"Good"_s));

    Manifest manifest = ScanKit();

    EXPECT_EQ(manifest.testModules.keys(), QStringList{"good"});
    EXPECT_TRUE(manifest.FindTestModule(u"good"_s).dynamicCast<UTTestModule>());
}

TEST_F(ManifestScanTest, CurrentCacheIsReadInsteadOfScanning)
{
    kit->AddSourceModule(u"tests/a/first"_s, MakeModule(u"ctf"_s, u"First"_s));
    {
        Manifest manifest(kit->Root(), false);
        Scan(manifest);
    }
    kit->AddSourceModule(u"tests/a/second"_s, MakeModule(u"ctf"_s, u"Second"_s));

    Manifest cached(kit->Root(), false);
    ASSERT_TRUE(cached.GenerateManifest(false));
    EXPECT_EQ(cached.testModules.keys(), QStringList{"first"});

    Manifest rescanned(kit->Root(), false);
    ASSERT_TRUE(rescanned.GenerateManifest(true));
    EXPECT_EQ(rescanned.testModules.keys(), (QStringList{"first", "second"}));
}

TEST(ManifestLogKind, ModuleKindFollowsTheLogName)
{
    const std::pair<const char *, const char *> rows[] = {
        {"Run-CTF-1.LOG", "ctf"}, {"/logs/Timer-ctf-2026.log", "ctf"},
        {"run.log", "ctfapplet"}, {"result.TXT", "uitf"},
        {"/a/b.xml", "uitf"},     {"module.oat", "oat"},
        {"x.bin", nullptr},       {"noextension", nullptr},
    };
    for (const auto &[path, type] : rows) {
        const auto module = Manifest::CreateTestModuleFromLog(QString::fromLatin1(path));
        EXPECT_EQ(module ? module->TestType() : QString(), QString::fromLatin1(type)) << path;
        EXPECT_TRUE(!module || module->moduleName.isEmpty());
    }
}

} // namespace
