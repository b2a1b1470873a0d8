// Building a catalogue by scanning kits made at test time, the cached catalogue file and the queries on a catalogue.

#include "catalogue/framework.h"
#include "catalogue/manifest.h"
#include "catalogue/testmodule.h"
#include "common/stringhash.h"
#include "log/log.h"
#include "modules/ctfapplettestmodule.h"
#include "modules/ctftestmodule.h"
#include "modules/oatframework.h"
#include "modules/oattestmodule.h"
#include "modules/secondarymodule.h"
#include "modules/uttestmodule.h"
#include "support/kitbuilder.h"
#include "support/testutil.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QTemporaryDir>

#include <gtest/gtest.h>

#include <memory>

#include <unistd.h>

using namespace Qt::StringLiterals;

namespace {

using kitbuilder::Module;

// A private data root and kit folder per test.
class ManifestFixture : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(m_dir.isValid());
        m_env.Set("KESTIX_DATA_ROOT", m_dir.path() + u"/data"_s);
        kit = std::make_unique<kitbuilder::KitBuilder>(m_dir.path() + u"/kit"_s);
        logger.SetLogPath(m_dir.path() + u"/log.txt"_s);
    }

    QString TempPath(const QString &relative) const { return m_dir.path() + u'/' + relative; }

    static kitbuilder::Module MakeModule(const QString &kind, const QString &name)
    {
        kitbuilder::Module module;
        module.kind = kind;
        module.name = name;
        module.testCases = {name + u"_1"_s, name + u"_2"_s};
        return module;
    }

    // Scans the kit from scratch.
    Manifest ScanKit(bool platform = false)
    {
        EXPECT_TRUE(kit->Ok()) << kit->Errors().join(u'\n').toStdString();
        Manifest manifest(kit->Root(), platform);
        manifest.SetLogger(&logger);
        EXPECT_TRUE(manifest.GenerateManifest(true));
        return manifest;
    }

    // A cache file of the manifest's kit holding text.
    void WriteCache(const Manifest &manifest, const QByteArray &text) { testutil::WriteFile(manifest.cacheFile, text); }

    QString LogText() const { return QString::fromLatin1(testutil::ReadFile(m_dir.path() + u"/log.txt"_s)); }

    QTemporaryDir m_dir;
    testutil::EnvGuard m_env;
    std::unique_ptr<kitbuilder::KitBuilder> kit;
    Log logger;
};

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
    ASSERT_TRUE(oat.dynamicCast<_OatFramework>());
    EXPECT_EQ(oat->classId, 0x0107556Bu);
    ASSERT_EQ(oat->variants.keys(), QStringList{"oat_RVCT22arm9_Release"});
    const QSharedPointer<_CompilerVariant> variant = oat->variants.first();
    EXPECT_EQ(variant->name + u' ' + variant->variant + u' ' + variant->build,
              u"oat_RVCT22arm9_Release RVCT22arm9 Release"_s);
    EXPECT_EQ(variant->arch, IKestoDevice::PLATFORM_ARM);
    EXPECT_EQ(variant->packagePath, kit->Path(u"testframeworks/run/oat_RVCT22arm9_Release.kestix"_s));

    const QSharedPointer<_Framework> ctf = manifest.frameworks.value(u"ctf"_s);
    EXPECT_FALSE(ctf.dynamicCast<_OatFramework>());
    EXPECT_EQ(ctf->classId, 0x0102F2AAu);
    ASSERT_EQ(ctf->variants.keys(), (QStringList{"ctf_RVCT22arm9_Release", "ctf_Win32_Debug"}));
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
    EXPECT_EQ(module->source + u' ' + module->family + u'/' + module->subFamily, u"PVS testframeworks/ctf"_s);
}

// Families come from the description or else from the path; broken descriptions are skipped; the first description of a
// name wins and later ones add their package targets; source modules get targets and prebuilt ones do not; oat modules
// find their baseline file.
TEST_F(ManifestScanTest, ModulesTakeTheirRecordsFromDescriptionPathAndPackages)
{
    kit->AddSourceModule(u"tests/multimedia/audio"_s, MakeModule(u"ctf"_s, u"Audio"_s));
    kit->AddSourceModule(u"API/Tests/net/socket/v2"_s, MakeModule(u"uitf"_s, u"Socket"_s));
    Module own = MakeModule(u"oat"_s, u"Own"_s);
    own.family = u"Telephony"_s;
    own.subFamily = u"Calls"_s;
    kit->AddSourceModule(u"tests/media/own"_s, own);
    kit->AddSourceModule(u"tests/Shallow"_s, MakeModule(u"ctfapplet"_s, u"Shallow"_s));
    kit->AddSourceModule(u"tests"_s, MakeModule(u"ctf"_s, u"Top"_s));

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

    Module source = MakeModule(u"ctf"_s, u"FromSource"_s);
    source.package.classIds = {0x01234567, 0x01234568};
    source.package.appletIds = {0x0ABCDEF0};
    kit->AddSourceModule(u"tests/x/source"_s, source);
    kit->AddPrebuiltModule(u"tests/x/prebuilt"_s, MakeModule(u"ctf"_s, u"Prebuilt"_s));
    // A package folder beside prebuilt binaries is not looked at for targets.
    kit->AddModulePackages(u"tests/x/prebuilt/package"_s, MakeModule(u"ctf"_s, u"Prebuilt"_s));

    kit->AddSourceModule(u"tests/oat/with"_s, MakeModule(u"oat"_s, u"With"_s));
    kit->AddFile(u"tests/oat/with/With.BaseLine"_s, "base");
    kit->AddSourceModule(u"tests/oat/without"_s, MakeModule(u"oat"_s, u"Without"_s));
    kit->AddFile(u"tests/oat/without/zzz.txt"_s, "x");
    // Broken and misnamed descriptions are skipped without stopping the walk.
    kit->AddFile(u"tests/broken/ctfmodule.xml"_s, "<module><suite NAME='Broken'>");
    kit->AddFile(u"tests/nosuite/ctfmodule.xml"_s, "<module><other NAME='NoSuite'/></module>");
    kit->AddFile(u"tests/notes/notes.xml"_s, "<notes/>");

    Manifest manifest = ScanKit();
    EXPECT_EQ(
        manifest.testModules.keys(),
        (QStringList{"audio", "dup", "fromsource", "own", "prebuilt", "shallow", "socket", "top", "with", "without"}));

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
    EXPECT_TRUE(manifest.FindTestModule(u"socket"_s).dynamicCast<UTTestModule>());

    const auto dup = manifest.testModules.value(u"dup"_s);
    ASSERT_TRUE(dup.dynamicCast<CtfTestModule>());
    EXPECT_EQ(dup->moduleName + u' ' + family("dup"), u"Dup a_win32/dup"_s);
    ASSERT_EQ(dup->testCases.size(), 2);
    EXPECT_EQ(dup->testCases.first().name, u"Dup_1"_s);
    EXPECT_EQ(dup->targets.keys(), (QStringList{"DUP_RVCT22arm9_Release", "Dup_Win32_Debug"}));
    // A target of a name already known keeps its first package.
    EXPECT_EQ(dup->targets.value(u"Dup_Win32_Debug"_s)->packagePath,
              kit->Path(u"tests/a_win32/dup/package/Dup_Win32_Debug.kestix"_s));

    const auto built = manifest.FindTestModule(u"fromsource"_s);
    EXPECT_EQ(built->sourcePath, kit->Path(u"tests/x/source"_s));
    EXPECT_EQ(built->targets.keys(), (QStringList{"FromSource_RVCT22arm9_Release", "FromSource_Win32_Debug"}));
    EXPECT_EQ(built->targets.value(u"FromSource_Win32_Debug"_s)->arch, IKestoDevice::PLATFORM_WIN32);
    EXPECT_EQ(built->classids, (QVector<unsigned int>{0x01234567, 0x01234568}));
    ASSERT_EQ(built->applets.size(), 1);
    EXPECT_EQ(built->applets[0].appletid, 0x0ABCDEF0u);
    const auto prebuilt = manifest.FindTestModule(u"prebuilt"_s);
    EXPECT_TRUE(prebuilt->targets.isEmpty() && prebuilt->sourcePath.isEmpty());

    EXPECT_EQ(manifest.FindTestModule(u"with"_s)->baseLineFile, kit->Path(u"tests/oat/with/With.BaseLine"_s));
    const auto without = manifest.FindTestModule(u"without"_s);
    EXPECT_TRUE(without->baseLineFile.isEmpty() && !without->targets.isEmpty());
}

// The last entry in name order that says "source" or "prebuilt" decides.
TEST_F(ManifestScanTest, LastClassifyingEntryDecidesBetweenSourceAndPrebuilt)
{
    // The entry, whether it is a folder, whether the module counts as source.
    const std::tuple<const char *, bool, bool> rows[] = {{"src", true, true}, // "src" after "m.MOD"
                                                         {"a.c", false, false}, // before it
                                                         {"Include", true, false}, // "include" < "m.mod"
                                                         {"z_inc", true, true}};
    for (int i = 0; i < 4; ++i) {
        const auto &[entry, isDirectory, source] = rows[i];
        const QString folder = u"tests/m/mixed%1"_s.arg(i);
        const Module module = MakeModule(u"ctf"_s, u"Mixed%1"_s.arg(i));
        kit->AddDescription(folder, module);
        kit->AddModulePackages(folder + u"/package"_s, module);
        if (isDirectory)
            kit->AddDirectory(folder + u'/' + QString::fromLatin1(entry));
        else
            kit->AddFile(folder + u'/' + QString::fromLatin1(entry), "x");
        kit->AddFile(folder + u"/m.MOD"_s, "x");
    }
    Manifest manifest = ScanKit();
    for (int i = 0; i < 4; ++i) {
        const auto &[entry, isDirectory, source] = rows[i];
        const auto found = manifest.FindTestModule(u"mixed%1"_s.arg(i));
        ASSERT_TRUE(found) << entry;
        EXPECT_EQ(!found->targets.isEmpty(), source) << entry;
        EXPECT_FALSE(found->sourcePath.isEmpty()) << "a source entry was seen in every case";
    }
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

    EXPECT_TRUE(manifest.secondaryModules.contains(u""_s));
    EXPECT_TRUE(manifest.secondaryModules.contains(u"Foo"_s));
    EXPECT_EQ(manifest.testModules.keys(), (QStringList{"HelperLib", "described", "foo", "oatBar"}));
    // The moved-in module keeps its package's records and targets.
    const auto helper = manifest.FindTestModule(u"helperlib"_s);
    ASSERT_TRUE(helper.dynamicCast<SecondaryModule>());
    EXPECT_EQ(helper->targets.size(), 2);
    EXPECT_TRUE(manifest.FindTestModule(u"Foo"_s).dynamicCast<CtfTestModule>());

    // Never offered for selection, whatever the pattern.
    QList<QSharedPointer<_TestModule>> selected;
    EXPECT_EQ(manifest.GetTestModules(selected, {}, QString(), QString()), 1u);
    EXPECT_EQ(testutil::ModuleNames(selected), QStringList{"Foo"});
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
    // A package that is not an archive, and one cut short, are refused with their reason: neither becomes a target.
    kit->AddFile(u"tests/mif/package/Mif_armgcc_Release.kestix"_s, QByteArray(700, 'x'));
    kit->AddFile(u"tests/mif/package/Mif_Win32_Release.kestix"_s,
                 testutil::ReadFile(kit->Path(u"tests/mif/package/Mif_Win32_Debug.kestix"_s)).left(1500));

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

TEST(ManifestLogKind, ModuleKindFollowsTheLogName)
{
    const std::pair<const char *, const char *> rows[] = {{"Run-CTF-1.LOG", "ctf"}, {"/logs/Timer-ctf-2026.log", "ctf"},
                                                          {"run.log", "ctfapplet"}, {"result.TXT", "uitf"},
                                                          {"/a/b.xml", "uitf"},     {"module.oat", "oat"},
                                                          {"x.bin", nullptr},       {"noextension", nullptr}};
    for (const auto &[path, type] : rows) {
        const auto module = Manifest::CreateTestModuleFromLog(QString::fromLatin1(path));
        EXPECT_EQ(module ? module->TestType() : QString(), QString::fromLatin1(type)) << path;
        EXPECT_TRUE(!module || module->moduleName.isEmpty());
    }
}

using ManifestCacheTest = ManifestFixture;

TEST_F(ManifestCacheTest, CacheLivesInTheFolderNamedByTheCleanedKitPath)
{
    Manifest manifest(kit->Root() + u"/tests/../"_s, false);
    EXPECT_EQ(manifest.kitPath, kit->Root());
    EXPECT_EQ(manifest.ManifestFilePath(),
              TempPath(u"data/Norvane/TestManifests/"_s) + StringHashName(kit->Root()) + u"/Manifest.xml"_s);
    EXPECT_TRUE(QFileInfo(manifest.cacheDirectory).isDir());

    Manifest other(kit->Root() + u"/tests"_s, false);
    EXPECT_NE(other.cacheFile, manifest.cacheFile);
}

TEST_F(ManifestCacheTest, OnlyAFormatOfFiveOrLaterIsCurrent)
{
    Manifest manifest(kit->Root(), false);
    EXPECT_FALSE(manifest.IsVersionOkay()) << "no cache";
    EXPECT_FALSE(manifest.ReadManifest());
    const std::pair<const char *, bool> rows[] = {{"<testkit version='5'/>", true},
                                                  {"<TestKit version='7' path='/elsewhere'/>", true},
                                                  {"<testkit version='4'/>", false},
                                                  {"<testkit/>", false},
                                                  {"<testkit version='-7'/>", false},
                                                  {"<testkit version='99999999999'/>", false},
                                                  {"<manifest version='5'/>", false},
                                                  {"<testkit version='5'>", false},
                                                  {"", false}};
    for (const auto &[text, current] : rows) {
        WriteCache(manifest, text);
        EXPECT_EQ(manifest.IsVersionOkay(), current) << text;
    }
}

TEST_F(ManifestCacheTest, CurrentCacheIsReadAndAStaleOrBrokenOneReplacedByAScan)
{
    kit->AddSourceModule(u"tests/a"_s, MakeModule(u"ctf"_s, u"Scanned"_s));
    for (const QByteArray &stale :
         {QByteArray("<testkit version='4'><testmodules><testmodule testtype='ctf' "
                     "moduleName='Old'/></testmodules></testkit>"),
          QByteArray("<testkit version='5'><testmodules><testmodule testtype='ctf' moduleName='Cut'/>")}) {
        Manifest manifest(kit->Root(), false);
        WriteCache(manifest, stale);
        ASSERT_TRUE(manifest.GenerateManifest(false));
        EXPECT_EQ(manifest.testModules.keys(), QStringList{"scanned"}) << stale.constData();
        EXPECT_TRUE(Manifest(kit->Root(), false).IsVersionOkay());
    }

    // A current cache is read instead of scanning, unless a scan is asked for.
    kit->AddSourceModule(u"tests/b"_s, MakeModule(u"ctf"_s, u"Second"_s));
    Manifest cached(kit->Root(), false);
    ASSERT_TRUE(cached.GenerateManifest(false));
    EXPECT_EQ(cached.testModules.keys(), QStringList{"scanned"});
    Manifest rescanned(kit->Root(), false);
    ASSERT_TRUE(rescanned.GenerateManifest(true));
    EXPECT_EQ(rescanned.testModules.keys(), (QStringList{"scanned", "second"}));
}

TEST_F(ManifestCacheTest, ReadingKeepsKnownKindsAndNamedFrameworksOnlyAndReplacesModules)
{
    Manifest manifest(kit->Root(), false);
    WriteCache(manifest,
               "<testkit version='5'>"
               "<TestModules>"
               "<testmodule testtype='oat' moduleName='One'/>"
               "<testmodule testtype='CTF' moduleName='Wrong case type'/>"
               "<testmodule moduleName='No type'/>"
               "<testmodule testtype='uitf'/>"
               "<TestModule testtype='ctfapplet' moduleName='ONE'/>"
               "<other testtype='ctf' moduleName='Other element'/>"
               "</TestModules>"
               "<frameworks>"
               "<framework name='oat'><classid value='17'/></framework>"
               "<Framework name='OAT'/>"
               "<framework/>"
               "</frameworks>"
               "</testkit>");
    ASSERT_TRUE(manifest.ReadManifest());
    // Names differing only in case share one entry: the later one wins.
    EXPECT_EQ(manifest.testModules.keys(), (QStringList{"", "one"}));
    EXPECT_EQ(manifest.testModules.value(u"one"_s)->TestType(), u"ctfapplet"_s);
    EXPECT_EQ(manifest.frameworks.keys(), (QStringList{"OAT", "oat"}));
    EXPECT_TRUE(manifest.frameworks.value(u"oat"_s).dynamicCast<_OatFramework>());
    EXPECT_FALSE(manifest.frameworks.value(u"OAT"_s).dynamicCast<_OatFramework>());
    EXPECT_EQ(manifest.frameworks.value(u"oat"_s)->classId, 17u);

    // Reading again replaces the modules but keeps the frameworks.
    WriteCache(manifest,
               "<testkit version='5'><testmodules><testmodule testtype='ctf' moduleName='B'/></testmodules>"
               "<frameworks><framework name='ctf'/></frameworks></testkit>");
    ASSERT_TRUE(manifest.ReadManifest());
    EXPECT_EQ(manifest.testModules.keys(), QStringList{"b"});
    EXPECT_EQ(manifest.frameworks.keys(), (QStringList{"OAT", "ctf", "oat"}));
}

// A kit with a module of every kind, records in their packages, and frameworks of both origins.
TEST_F(ManifestCacheTest, WrittenCatalogueIsWellFormedAndReadsBackTheSame)
{
    Module ctf = MakeModule(u"ctf"_s, u"Timer"_s);
    ctf.family = u"Kernel"_s;
    ctf.minKestoVersion = u"3.1"_s;
    ctf.secondaryModules = {u"helperlib"_s};
    ctf.package.classIds = {0x01020304, 0x01020305};
    ctf.package.programs = {{u"Timer_k"_s, u"-all"_s}, {u"Other"_s, QString()}};
    kit->AddSourceModule(u"tests/kernel/timer"_s, ctf);

    Module applet = MakeModule(u"ctfapplet"_s, u"Browser"_s);
    applet.package.appletIds = {0x0A0B0C0D, 0x0A0B0C0E};
    kit->AddSourceModule(u"tests/net/browser"_s, applet);

    Module oat = MakeModule(u"oat"_s, u"Contacts"_s);
    oat.package.suitePrograms = {u"kesto:suite:Contacts"_s};
    kit->AddSourceModule(u"tests/pim/contacts"_s, oat);
    kit->AddFile(u"tests/pim/contacts/Contacts.baseline"_s, "b");

    Module menu = MakeModule(u"uitf"_s, u"Menu"_s);
    menu.family = u"Menüs \u65e5\u672c"_s;
    kit->AddSourceModule(u"tests/ui/menu"_s, menu);
    kit->AddPrebuiltModule(u"tests/ui/prebuilt"_s, MakeModule(u"uitf"_s, u"Prebuilt"_s));
    kit->AddModulePackages(u"libs/helper/package"_s, MakeModule(u"ctf"_s, u"helperlib"_s));

    kit->AddFrameworkPackage(u"testframeworks"_s, u"oat"_s, u"RVCT22arm9"_s, u"Release"_s);
    kit->AddFrameworkPackage(u"testframeworks"_s, u"ctf"_s, u"Win32"_s, u"Debug"_s);
    Manifest scanned = ScanKit();
    ASSERT_EQ(scanned.testModules.keys(),
              (QStringList{"browser", "contacts", "helperlib", "menu", "prebuilt", "timer"}));

    const QByteArray bytes = testutil::ReadFile(scanned.cacheFile);
    EXPECT_TRUE(bytes.startsWith("<testkit ")) << "no XML declaration";
    QDomDocument document;
    ASSERT_TRUE(document.setContent(bytes));
    const QDomElement root = document.documentElement();
    EXPECT_EQ(root.attribute(u"version"_s), u"5"_s);
    EXPECT_EQ(root.attribute(u"path"_s), kit->Root());
    EXPECT_EQ(root.attribute(u"hash"_s), scanned.RootHash());
    EXPECT_EQ(root.firstChildElement().tagName(), u"testmodules"_s);
    EXPECT_EQ(root.lastChildElement().tagName(), u"frameworks"_s);
    EXPECT_EQ(root.firstChildElement().childNodes().size(), 6);
    testutil::ExpectXmllintAccepts(scanned.cacheFile);
    // The tool scans in a process of its own, with its own hash seed: the catalogue it writes must hold the same bytes.
    QByteArray output;
    ASSERT_EQ(testutil::RunProgram(u"" HARNESS_BINARY_DIR "/harness"_s,
                                   {u"manifest"_s, u"--kit"_s, kit->Root(), u"-o"_s, TempPath(u"tool"_s)}, &output),
              0)
        << output.toStdString();
    EXPECT_EQ(testutil::ReadFile(TempPath(u"tool/KVKManifest.xml"_s)), bytes);

    Manifest read(kit->Root(), false);
    ASSERT_TRUE(read.IsVersionOkay());
    ASSERT_TRUE(read.ReadManifest());
    // What the scan found is really there; the kinds and hashes come back as the byte comparison below shows.
    ASSERT_EQ(read.testModules.size(), scanned.testModules.size());
    const auto timer = read.FindTestModule(u"TIMER"_s).dynamicCast<CtfTestModule>();
    ASSERT_TRUE(timer);
    EXPECT_EQ(timer->classids, (QVector<unsigned int>{0x01020304, 0x01020305}));
    EXPECT_EQ(timer->ModuleName(), u"Timer_k"_s);
    const auto contacts = read.FindTestModule(u"contacts"_s).dynamicCast<OatTestModule>();
    ASSERT_TRUE(contacts);
    EXPECT_EQ(contacts->ModuleName(), u"Contacts"_s);
    EXPECT_EQ(contacts->baseLineFile, kit->Path(u"tests/pim/contacts/Contacts.baseline"_s));
    EXPECT_EQ(read.FindTestModule(u"browser"_s)->applets.size(), 2);
    EXPECT_TRUE(read.FindTestModule(u"helperlib"_s).dynamicCast<SecondaryModule>());
    EXPECT_EQ(read.FindTestModule(u"menu"_s)->family, u"Menüs \u65e5\u672c"_s);
    QList<QSharedPointer<_Framework>> frameworks;
    ASSERT_EQ(read.GetFrameworks(frameworks), 2u);
    EXPECT_EQ(frameworks[0]->name, u"ctf"_s);
    EXPECT_TRUE(frameworks[1].dynamicCast<_OatFramework>());

    // Everything, including the kinds' own elements, survives: the read catalogue writes the same bytes, except for the
    // empty "data" marks of program records, whose bytes the manifest never holds.
    const QString again = TempPath(u"again.xml"_s);
    ASSERT_TRUE(read.WriteManifest(again));
    QByteArray expected = bytes;
    ASSERT_TRUE(expected.contains("<data/>"));
    expected.replace("     <data/>\n", "");
    EXPECT_EQ(testutil::ReadFile(again), expected);
}

TEST_F(ManifestCacheTest, EmptyCatalogueIsNeverWrittenNorOneToAnUnwritablePlace)
{
    kit->AddFrameworkPackage(u"testframeworks"_s, u"ctf"_s, u"Win32"_s, u"Debug"_s);
    Manifest manifest(kit->Root(), false);
    manifest.SetLogger(&logger);
    EXPECT_FALSE(manifest.GenerateManifest(false));
    EXPECT_FALSE(QFile::exists(manifest.cacheFile));
    EXPECT_TRUE(LogText().contains(u"WriteManifest has zero test cases to write"_s));
    EXPECT_FALSE(manifest.WriteManifest(TempPath(u"empty.xml"_s)));
    EXPECT_FALSE(QFile::exists(TempPath(u"empty.xml"_s)));

    // Writing recreates a missing cache folder, but an unwritable destination answers false with a message.
    kit->AddSourceModule(u"tests/a"_s, MakeModule(u"ctf"_s, u"A"_s));
    ASSERT_TRUE(QDir(manifest.cacheDirectory).removeRecursively());
    ASSERT_TRUE(manifest.GenerateManifest(true));
    EXPECT_TRUE(QFile::exists(manifest.cacheFile));

    testutil::WriteFile(TempPath(u"plainfile"_s), "x");
    const QString destination = TempPath(u"plainfile/Manifest.xml"_s);
    EXPECT_FALSE(manifest.WriteManifest(destination));
    EXPECT_TRUE(LogText().contains(destination)) << LogText().toStdString();

    // The cache path itself may be unwritable too.
    ASSERT_TRUE(QFile::remove(manifest.cacheFile));
    ASSERT_TRUE(QDir().mkpath(manifest.cacheFile));
    EXPECT_FALSE(manifest.WriteManifest(QString()));
    EXPECT_TRUE(QFileInfo(manifest.cacheFile).isDir());
}

class ManifestQueryTest : public ManifestFixture
{
protected:
    void SetUp() override
    {
        ManifestFixture::SetUp();
        manifest = std::make_unique<Manifest>(kit->Root(), false);
        WriteCache(*manifest,
                   "<testkit version='5'><testmodules>"
                   "<testmodule testtype='ctf' moduleName='Net' family='Connectivity'/>"
                   "<testmodule testtype='ctf' moduleName='EtherNet' family='Connectivity' subFamily='Wired'/>"
                   "<testmodule testtype='oat' moduleName='NetWork' family='MultiMedia' subFamily='Streaming'/>"
                   "<testmodule testtype='uitf' moduleName='SubNetTool' family='media'/>"
                   "<testmodule testtype='ctfapplet' moduleName='Audio' family='Multimedia' subFamily='Playback'/>"
                   "<testmodule testtype='secondary' moduleName='NetLib' family='Media'/>"
                   "</testmodules></testkit>");
        ASSERT_TRUE(manifest->ReadManifest());
    }

    QStringList Select(const QStringList &names, const QString &family = QString(),
                       const QString &subFamily = QString())
    {
        QList<QSharedPointer<_TestModule>> out;
        const unsigned int count = manifest->GetTestModules(out, names, family, subFamily);
        EXPECT_EQ(count, static_cast<unsigned int>(out.size()));
        return testutil::ModuleNames(out);
    }

    std::unique_ptr<Manifest> manifest;
};

TEST_F(ManifestQueryTest, NamePatternsUseLeadingAndTrailingWildCards)
{
    EXPECT_EQ(Select({u"*net"_s}), (QStringList{"EtherNet", "Net"}));
    EXPECT_EQ(Select({u"net*"_s}), (QStringList{"Net", "NetWork"}));
    EXPECT_EQ(Select({u"*NET*"_s}), (QStringList{"EtherNet", "Net", "NetWork", "SubNetTool"}));
    EXPECT_EQ(Select({u"net"_s}), QStringList{"Net"});
    EXPECT_EQ(Select({u"nothing"_s}), QStringList{});
    // Each module is taken once, on the first pattern that fits; the family filters do not apply to names.
    EXPECT_EQ(Select({u"*net"_s, u"net*"_s, u"audio"_s}, u"none"_s),
              (QStringList{"Audio", "EtherNet", "Net", "NetWork"}));
    EXPECT_EQ(Select({u"*"_s}).size(), 5);
    // The selection appends to what the list holds.
    QList<QSharedPointer<_TestModule>> out{manifest->FindTestModule(u"audio"_s)};
    EXPECT_EQ(manifest->GetTestModules(out, {u"net"_s}, QString(), QString()), 2u);
}

TEST_F(ManifestQueryTest, FamiliesAndNamesAreMatchedIgnoringCase)
{
    EXPECT_EQ(Select({}, u"Media"_s), (QStringList{"Audio", "NetWork", "SubNetTool"}));
    EXPECT_EQ(Select({}, u"media"_s, u"PLAY"_s), QStringList{"Audio"});
    EXPECT_EQ(Select({}), (QStringList{"Audio", "EtherNet", "Net", "NetWork", "SubNetTool"}));
    // A sub-family alone filters nothing.
    EXPECT_EQ(Select({}, QString(), u"Wired"_s).size(), 5);

    // Finding a module by name ignores case and finds secondary modules.
    ASSERT_TRUE(manifest->FindTestModule(u"eTHERnET"_s));
    EXPECT_EQ(manifest->FindTestModule(u"ETHERNET"_s)->moduleName, u"EtherNet"_s);
    EXPECT_TRUE(manifest->FindTestModule(u"netlib"_s).dynamicCast<SecondaryModule>());
    EXPECT_FALSE(manifest->FindTestModule(u"ether"_s));
}

} // namespace
