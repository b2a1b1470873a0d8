// The library's view of the host: platforms, test sets, its own folders, helper programs and device packs.

#include "environment/devicexml.h"
#include "environment/platforms.h"
#include "environment/testdirectories.h"

#include "support/testutil.h"

#include <QDir>
#include <QDomDocument>
#include <QFile>
#include <QFileInfo>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

// A private data root, platforms root and test sets root, with none of the user's settings.
class EnvironmentTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(temp.isValid());
        base = temp.path() + u"/data"_s;
        root = temp.path() + u"/platforms"_s;
        kits = temp.path() + u"/Tests"_s;
        env.Set("KESTIX_DATA_ROOT", base + u'/');
        for (const char *name : {"KESTIX_PLATFORMS_ALL", "KESTIX_PLATFORM", "KESTIX_TESTSETS_ALL", "KESTIX_TESTSET"})
            env.Unset(name);
    }

    void MakeDirs(const QString &parent, const QStringList &names)
    {
        for (const QString &name : names)
            ASSERT_TRUE(QDir().mkpath(parent + u'/' + name));
    }

    QTemporaryDir temp;
    QString base, root, kits;
    testutil::EnvGuard env;
};
using PlatformsTest = EnvironmentTest;
using TestDirectoriesTest = EnvironmentTest;

// Each platform as "name|path|pro|default", root written as R.
QStringList Describe(const QList<Platform> &platforms, const QString &root)
{
    QStringList rows;
    for (const Platform &platform : platforms)
        rows << u"%1|%2|%3|%4"_s.arg(platform.name, QString(platform.path).replace(root, u"R"_s))
                    .arg(platform.isPro)
                    .arg(platform.isDefault);
    return rows;
}

TEST_F(PlatformsTest, ListsSubDirectoriesByNameStrippingTheProWord)
{
    QList<Platform> platforms{Platform()};
    EXPECT_EQ(GetPlatforms(platforms), 0u) << "no platforms root";
    EXPECT_TRUE(platforms.isEmpty());

    MakeDirs(root, {"Product", "Foo Pro", "abc", "Pro", "My Project", "Bar PRO 2", "zed"});
    testutil::WriteFile(root + u"/notes.txt"_s, "not a platform");
    env.Set("KESTIX_PLATFORMS_ALL", root);
    ASSERT_EQ(GetPlatforms(platforms), 7u);
    EXPECT_EQ(Describe(platforms, root),
              (QStringList{"abc|R/abc|0|0", "Bar 2|R/Bar PRO 2|1|0", "Foo|R/Foo Pro|1|0", "My Project|R/My Project|1|0",
                           "Pro|R/Pro|1|0", "Product|R/Product|1|0", "zed|R/zed|0|0"}));
}

TEST_F(PlatformsTest, DefaultPlatformIsMatchedIgnoringCase)
{
    MakeDirs(root, {"abc", "Foo Pro"});
    env.Set("KESTIX_PLATFORMS_ALL", root);
    env.Set("KESTIX_PLATFORM", (root + u"/ABC/"_s).toUpper());

    QList<Platform> platforms;
    ASSERT_EQ(GetPlatforms(platforms), 2u);
    EXPECT_EQ(Describe(platforms, root), (QStringList{"abc|R/abc|0|1", "Foo|R/Foo Pro|1|0"}));

    // A root written with a trailing separator still finds its default.
    env.Set("KESTIX_PLATFORMS_ALL", root + u'/');
    env.Set("KESTIX_PLATFORM", root + u"/Foo Pro/bin"_s);
    ASSERT_EQ(GetPlatforms(platforms), 2u);
    EXPECT_EQ(Describe(platforms, root), (QStringList{"abc|R//abc|0|0", "Foo|R//Foo Pro|1|1"}));

    // A setting without a separator names no platform.
    env.Set("KESTIX_PLATFORM", u"abc"_s);
    ASSERT_EQ(GetPlatforms(platforms), 2u);
    EXPECT_EQ(Describe(platforms, root), (QStringList{"abc|R//abc|0|0", "Foo|R//Foo Pro|1|0"}));
}

TEST_F(PlatformsTest, ProAndNonProListsAppendWithoutClearing)
{
    MakeDirs(root, {"abc", "Foo Pro", "Pro", "zed"});
    env.Set("KESTIX_PLATFORMS_ALL", root);

    QList<Platform> pro;
    EXPECT_EQ(GetProPlatforms(pro), 2u);
    EXPECT_EQ(GetProPlatforms(pro), 4u);
    EXPECT_EQ(Describe(pro, root),
              (QStringList{"Foo|R/Foo Pro|1|0", "Pro|R/Pro|1|0", "Foo|R/Foo Pro|1|0", "Pro|R/Pro|1|0"}));

    QList<Platform> mixed = pro.mid(0, 1);
    EXPECT_EQ(GetNonProPlatforms(mixed), 3u);
    EXPECT_EQ(Describe(mixed, root), (QStringList{"Foo|R/Foo Pro|1|0", "abc|R/abc|0|0", "zed|R/zed|0|0"}));

    env.Unset("KESTIX_PLATFORMS_ALL");
    EXPECT_EQ(GetProPlatforms(mixed), 3u);
}

TEST(DefaultPlatform, CutsAtLastBackslashThenLastSlash)
{
    const std::tuple<const char *, bool, const char *> rows[]
        = {{"", false, ""},
           {"C:\\sdk\\platforms\\abc\\", true, "C:\\sdk\\platforms\\abc"},
           {"C:\\sdk\\platforms\\abc", true, "C:\\sdk\\platforms"},
           {"/opt/sdk/abc/", true, "/opt/sdk/abc"},
           {"/opt/sdk/abc", true, "/opt/sdk"},
           {"a/b\\c/d", true, "a/b"}, // a backslash anywhere wins over later forward slashes
           {"abc", true, "abc"}};
    testutil::EnvGuard env;
    for (const auto &[setting, found, path] : rows) {
        env.Set("KESTIX_PLATFORM", QString::fromUtf8(setting));
        QString out = u"stale"_s;
        EXPECT_EQ(GetDefaultPlatform(out), found) << setting;
        EXPECT_EQ(out, QString::fromUtf8(path));
    }
}

TEST_F(PlatformsTest, TestKitsDefaultToTestsBesidePlatformsRoot)
{
    MakeDirs(root, {"abc"});
    MakeDirs(kits, {"kitB", "kitA"});
    env.Set("KESTIX_PLATFORMS_ALL", root + u'/');

    EXPECT_EQ(GetTestSetsRoot(), kits);
    QList<TestKit> found{TestKit()};
    ASSERT_EQ(GetTestKits(found), 2u);
    EXPECT_EQ(found[0].name + u'|' + found[0].path, u"kitA|"_s + kits + u"/kitA"_s);
    EXPECT_EQ(found[0].type, TestKit::TEST_KIT);
    EXPECT_FALSE(found[0].reserved);
    EXPECT_EQ(found[1].name, u"kitB"_s);

    // An explicit root takes precedence and is cleaned.
    const QString other = temp.path() + u"/other"_s;
    MakeDirs(other, {"only"});
    env.Set("KESTIX_TESTSETS_ALL", other + u"/./"_s);
    ASSERT_EQ(GetTestKits(found), 1u);
    EXPECT_EQ(found[0].path, other + u"/only"_s);
    // Only an empty root falls back beside the platforms; others are taken as written.
    env.Set("KESTIX_PLATFORMS_ALL", u"/sdk/./platforms"_s);
    env.Set("KESTIX_TESTSETS_ALL", u"/kits/../kits"_s);
    EXPECT_EQ(GetTestSetsRoot(), u"/kits/../kits"_s);
    env.Set("KESTIX_TESTSETS_ALL", QString());
    EXPECT_EQ(GetTestSetsRoot(), u"/sdk/Tests"_s);
}

TEST_F(PlatformsTest, DefaultTestKitIsTheNamedOneExactlyOrTheGreatestName)
{
    env.Set("KESTIX_TESTSETS_ALL", kits);
    env.Set("KESTIX_TESTSET", kits + u"/kitB"_s);
    TestKit kit;
    kit.name = u"mine"_s;
    EXPECT_FALSE(GetDefaultTestKit(kit)); // none installed
    EXPECT_EQ(kit.name, u"mine"_s);

    MakeDirs(kits, {"kitA", "kitB"});
    ASSERT_TRUE(GetDefaultTestKit(kit));
    EXPECT_EQ(kit.name, u"kitB"_s);
    EXPECT_EQ(kit.path, kits + u"/kitB"_s);

    env.Set("KESTIX_TESTSET", u"C:\\kits\\kitA"_s);
    ASSERT_TRUE(GetDefaultTestKit(kit));
    EXPECT_EQ(kit.name, u"kitA"_s);

    // Not installed, or differing in case only: nothing picked, out unchanged.
    for (const char *setting : {"/kits/kitC", "/kits/KITA"}) {
        env.Set("KESTIX_TESTSET", QString::fromUtf8(setting));
        TestKit untouched;
        untouched.name = u"mine"_s;
        EXPECT_FALSE(GetDefaultTestKit(untouched)) << setting;
        EXPECT_EQ(untouched.name, u"mine"_s);
        EXPECT_EQ(untouched.type, TestKit::USER_KIT);
    }

    // A test set ending in a separator picks the greatest name, ordinally: lower-case names sort after upper-case ones.
    const QString more = temp.path() + u"/more"_s;
    MakeDirs(more, {"alpha", "Zeta", "beta"});
    env.Set("KESTIX_TESTSETS_ALL", more);
    env.Set("KESTIX_TESTSET", more + u'/');
    EXPECT_EQ(GetDefaultTestKitName(), QString());
    ASSERT_TRUE(GetDefaultTestKit(kit));
    EXPECT_EQ(kit.name, u"beta"_s);

    // Whatever out held before does not change the choice.
    TestKit prefilled;
    prefilled.name = u"zzz"_s;
    ASSERT_TRUE(GetDefaultTestKit(prefilled));
    EXPECT_EQ(prefilled.name, u"beta"_s);
}

TEST(TestKitNames, DefaultTestKitNameIsTheLastComponentAndTypesHaveNames)
{
    testutil::EnvGuard env;
    const std::pair<const char *, const char *> cases[]
        = {{"", ""},      {"kit", "kit"}, {"/a/b/kit", "kit"}, {"C:\\a\\kit", "kit"}, {"a\\kit/x", "kit/x"},
           {"/a/b/", ""}, {"/kit", "kit"}};
    for (const auto &[setting, name] : cases) {
        env.Set("KESTIX_TESTSET", QString::fromUtf8(setting));
        EXPECT_EQ(GetDefaultTestKitName(), QString::fromUtf8(name)) << setting;
    }

    QStringList names;
    for (const int type : {int(TestKit::USER_KIT), int(TestKit::TEST_KIT), int(TestKit::PVS_KIT), 7, -1})
        names << TestKit::TypeToName(static_cast<TestKit::KitType>(type));
    EXPECT_EQ(names, (QStringList{"User Kit", "Test Kit", "Pvs Kit", "unknown", "unknown"}));
}

TEST(BreakPackageName, SplitsIntoNameVariantAndBuild)
{
    const std::tuple<const char *, bool, const char *, const char *, const char *> rows[]
        = {{"my_mod_RVCT22arm9_Release.kestix", true, "my_mod", "RVCT22arm9", "Release"},
           {"mod_GCCE_UDEB.KESTIX", true, "mod", "GCCE", "UDEB"},
           {"a__b_c", true, "a", "b", "c"},
           {"x_y__b_c", true, "x_y", "b", "c"},
           {"_b_c", true, "", "b", "c"},
           {"a_b_", true, "a", "b", ""},
           {"a.kestix_b.kestix_c.kestix", true, "a", "b", "c"},
           {"a_b.kestix", false, "", "2", "3"},
           {"plain", false, "", "2", "3"},
           {"", false, "", "2", "3"}};
    for (const auto &[package, split, first, middle, last] : rows) {
        // Too few parts leave the outputs as they were; callers pass first empty.
        QString parts[3] = {QString(), u"2"_s, u"3"_s};
        EXPECT_EQ(BreakPackageName(QString::fromUtf8(package), parts[0], parts[1], parts[2]), split) << package;
        EXPECT_EQ(QStringList(parts, parts + 3), (QStringList{first, middle, last})) << package;
    }
}

TEST_F(TestDirectoriesTest, CacheAndResultsFoldersAreCreatedButNotTheirFiles)
{
    const QString manifests = TestDirectories::GetManifestDirectory(u"#42"_s);
    EXPECT_EQ(manifests, base + u"/Norvane/TestManifests/#42"_s);
    EXPECT_TRUE(QFileInfo(manifests).isDir());

    EXPECT_EQ(TestDirectories::GetTestDataPath(), base + u"/Norvane/TestDataCache"_s);

    const QString kar = TestDirectories::GetTestDataCacheFilePath(u"#7"_s);
    EXPECT_EQ(kar, base + u"/Norvane/TestDataCache/#7.kar"_s);
    EXPECT_FALSE(QFileInfo::exists(kar));

    const QString dso = TestDirectories::GetDSOCacheFilePath(u"#7"_s);
    EXPECT_EQ(dso, base + u"/Norvane/TestDataCache/DSOFiles/#7.dso"_s);
    EXPECT_TRUE(QFileInfo(QFileInfo(dso).path()).isDir());
    EXPECT_FALSE(QFileInfo::exists(dso));

    // An empty data root falls back to the generic data location.
    const QString xdg = temp.path() + u"/xdg"_s;
    ASSERT_TRUE(QDir().mkpath(xdg));
    env.Set("XDG_DATA_HOME", xdg);
    env.Set("KESTIX_DATA_ROOT", QString());
    EXPECT_EQ(TestDirectories::GetTestDataPath(), xdg + u"/Norvane/TestDataCache"_s);
    env.Set("KESTIX_DATA_ROOT", base);

    const QString path = TestDirectories::GetProcessResultsPath(u"phone"_s);
    const QString logs = base + u"/Norvane/Targets/phone/Logs"_s;
    EXPECT_EQ(path, logs + u"/ProcessedResults/ProcessedResults.xml"_s);
    EXPECT_TRUE(QFileInfo(logs + u"/ProcessedResults"_s).isDir());
    EXPECT_FALSE(QFileInfo::exists(path));
    EXPECT_EQ(TestDirectories::GetLogDirectory(u"phone"_s), logs);

    // Asking again leaves what is there alone.
    testutil::WriteFile(path, "<results/>");
    EXPECT_EQ(TestDirectories::GetProcessResultsPath(u"phone"_s), path);
    EXPECT_EQ(testutil::ReadFile(path), QByteArray("<results/>"));
}

TEST_F(TestDirectoriesTest, TargetNameBecomesOneFolderBelowTargets)
{
    const std::pair<const char *, const char *> rows[] = {{"My Phone:1", "My%20Phone%3A1"},
                                                          {"a/b\\c", "a%2Fb%5Cc"},
                                                          {"Az09-._~", "Az09-._~"},
                                                          {"100%", "100%25"},
                                                          {"..", "%2E%2E"},
                                                          {".", "%2E"},
                                                          {"a..b", "a..b"},
                                                          {"T\xc3\xa9l\xc3\xa9phone", "T%E9l%E9phone"},
                                                          {"\xe9\x9b\xbb\xe8\xa9\xb1", "%E9%9B%BB%E8%A9%B1"}};
    const QString targets = base + u"/Norvane/Targets"_s;
    for (const auto &[target, folder] : rows) {
        const QString directory = TestDirectories::GetTargetDirectory(QString::fromUtf8(target));
        EXPECT_EQ(directory, targets + u'/' + QString::fromLatin1(folder));
        EXPECT_TRUE(QFileInfo(directory).isDir()) << folder;
    }
}

// The folder is filled once, from the default test set; an empty one, made
// before the test set was named or by hand, stays empty.
TEST_F(TestDirectoriesTest, OatPerlScriptsAreCopiedOnceAndNeverRefreshed)
{
    const QString tools = temp.path() + u"/kit/testframeworks/oat/tools/bin"_s;
    QString scripts = base + u"/Norvane/TestDataCache/PerlScripts"_s;
    EXPECT_EQ(TestDirectories::GetOatPerlScripts(), scripts);
    testutil::WriteFile(tools + u"/PostProcess3.pl"_s, "print 1;\n");
    testutil::WriteFile(tools + u"/helper.pm"_s, "1;\n");
    ASSERT_TRUE(QDir().mkpath(tools + u"/subdir"_s));
    env.Set("KESTIX_TESTSET", temp.path() + u"/kit"_s);
    EXPECT_EQ(TestDirectories::GetOatPerlScripts(), scripts);
    EXPECT_TRUE(QDir(scripts).isEmpty());

    env.Set("KESTIX_DATA_ROOT", temp.path() + u"/other"_s);
    scripts = temp.path() + u"/other/Norvane/TestDataCache/PerlScripts"_s;
    EXPECT_EQ(TestDirectories::GetOatPerlScripts(), scripts);
    EXPECT_EQ(QDir(scripts).entryList(QDir::AllEntries | QDir::NoDotAndDotDot, QDir::Name | QDir::IgnoreCase),
              QStringList({"helper.pm", "PostProcess3.pl"}));
    testutil::WriteFile(tools + u"/PostProcess3.pl"_s, "print 2;\n");
    testutil::WriteFile(tools + u"/new.pl"_s, "new\n");
    EXPECT_EQ(TestDirectories::GetOatPerlScripts(), scripts);
    EXPECT_EQ(testutil::ReadFile(scripts + u"/PostProcess3.pl"_s), QByteArray("print 1;\n"));
    EXPECT_FALSE(QFileInfo::exists(scripts + u"/new.pl"_s));
}

TEST_F(TestDirectoriesTest, GenerateProPlatformMatchesNameThenDefault)
{
    MakeDirs(root, {"Alpha Pro", "beta pro", "Gamma"});
    env.Set("KESTIX_PLATFORMS_ALL", root);
    const auto generate = [this](const QString &name) {
        return Describe({TestDirectories::GenerateProPlatform(name)}, root);
    };
    EXPECT_EQ(generate(u"BETA"_s), QStringList{"beta|R/beta pro|1|0"});
    // Non-professional platforms are never chosen, and no default: empty.
    EXPECT_EQ(generate(u"gamma"_s), QStringList{"||0|0"});
    env.Set("KESTIX_PLATFORM", root + u"/Alpha Pro/"_s);
    EXPECT_EQ(generate(u"gamma"_s), QStringList{"Alpha|R/Alpha Pro|1|1"});
    EXPECT_EQ(generate(u"beta"_s), QStringList{"beta|R/beta pro|1|0"});
}

TEST_F(TestDirectoriesTest, ResolveXmlPathSearchOrder)
{
    const QString work = temp.path() + u"/work"_s, home = temp.path() + u"/home"_s, pack = temp.path() + u"/pack"_s;
    for (const QString &file : {work + u"/here.xml"_s, home + u"/athome.xml"_s, pack + u"/device.xml"_s,
                                pack + u"/beside.xml"_s, pack + u"/sub/deep.xml"_s, pack + u"/flat.xml"_s})
        testutil::WriteFile(file, "<a/>");
    ASSERT_TRUE(QDir().mkpath(work + u"/folder"_s));
    env.Set("HOME", home);
    testutil::CurrentDirectory cd(work);
    const QString reference = pack + u"/device.xml"_s;

    EXPECT_EQ(ResolveXmlPath(u"/no/such/file.xml"_s, reference), u"/no/such/file.xml"_s);
    EXPECT_EQ(ResolveXmlPath(u"here.xml"_s, reference), work + u"/here.xml"_s);
    EXPECT_EQ(ResolveXmlPath(u"athome.xml"_s, reference), home + u"/athome.xml"_s);
    EXPECT_EQ(ResolveXmlPath(u"beside.xml"_s, reference), pack + u"/beside.xml"_s);
    EXPECT_EQ(ResolveXmlPath(u"sub/deep.xml"_s, reference), pack + u"/sub/deep.xml"_s);
    EXPECT_EQ(ResolveXmlPath(u"elsewhere/flat.xml"_s, reference), pack + u"/flat.xml"_s);
    EXPECT_EQ(ResolveXmlPath(u"beside.xml"_s, QString()), QString());
    EXPECT_EQ(ResolveXmlPath(u"missing.xml"_s, reference), QString());
    // A folder is not a file.
    EXPECT_EQ(ResolveXmlPath(u"folder"_s, reference), QString());
    EXPECT_EQ(ResolveXmlPath(QString(), reference), QString());
}

TEST_F(TestDirectoriesTest, AssociatedExecutableIsNamedByTheShebangThenTheSuffix)
{
    const auto executable = [](const QString &path) {
        testutil::WriteFile(path, "#!/bin/sh\nexit 0\n");
        QFile::setPermissions(path, QFile::ReadOwner | QFile::WriteOwner | QFile::ExeOwner);
        return path;
    };
    const auto script = [this](const QString &name, const QByteArray &content) {
        testutil::WriteFile(temp.path() + u"/scripts/"_s + name, content);
        return temp.path() + u"/scripts/"_s + name;
    };
    const QString bin = temp.path() + u"/bin"_s;
    for (const char *program : {"perl", "python3", "sh"})
        executable(bin + u'/' + QString::fromLatin1(program));
    env.Set("PATH", bin);
    const QString own = executable(temp.path() + u"/tools/interp"_s);
    const std::tuple<const char *, QByteArray, QString> rows[]
        = {{"a", "#!/usr/bin/env perl\nprint;\n", bin + u"/perl"_s},
           {"b.txt", "#! /usr/bin/env -S python3 -u\n", bin + u"/python3"_s},
           {"c.pl", "#!/bin/sh\necho\n", u"/bin/sh"_s},
           {"d", "#!perl -w\r\n", bin + u"/perl"_s},
           {"e", "#!" + own.toUtf8() + " --x\n", own},
           {"PostProcess3.pl", "print 1;\n", bin + u"/perl"_s},
           {"Tool.PL", "", bin + u"/perl"_s},
           {"x.py", "print(1)\n", bin + u"/python3"_s},
           {"x.sh", "echo\n", bin + u"/sh"_s},
           // A "#!" naming an interpreter that is not there falls back to the suffix.
           {"y.pl", "#!/no/such/perl\n", bin + u"/perl"_s},
           {"notes.txt", "hello\n", QString()},
           {"noext", "", QString()},
           {"z", "#!/usr/bin/env\n", QString()}};
    for (const auto &[name, content, found] : rows)
        EXPECT_EQ(FindAssociatedExecutable(script(QString::fromLatin1(name), content)), found) << name;
    EXPECT_EQ(FindAssociatedExecutable(temp.path() + u"/missing.pl"_s), QString());
    EXPECT_EQ(FindAssociatedExecutable(temp.path()), QString());
    env.Set("PATH", temp.path() + u"/empty"_s);
    EXPECT_EQ(FindAssociatedExecutable(script(u"p.pl"_s, "print 1;\n")), QString());
    EXPECT_EQ(FindAssociatedExecutable(script(u"q"_s, "#!/usr/bin/env perl\n")), QString());
}

class FlattenDeviceXmlTest : public EnvironmentTest
{
protected:
    void SetUp() override
    {
        EnvironmentTest::SetUp();
        pack = temp.path() + u"/pack"_s;
        output = temp.path() + u"/device.dso"_s;
        env.Set("HOME", temp.path() + u"/home"_s);
    }

    QString Write(const QString &name, const QByteArray &bytes)
    {
        const QString path = pack + u'/' + name;
        testutil::WriteFile(path, bytes);
        return path;
    }

    // Flattens from another current directory, so that includes can only be found beside the device pack.
    QByteArray Flatten(const QString &source)
    {
        testutil::CurrentDirectory cd(temp.path());
        EXPECT_TRUE(FlattenDeviceXml(source, output));
        return testutil::ReadFile(output);
    }

    // xmllint's verdict on the flattened file, when it is installed.
    void ExpectWellFormed() { testutil::ExpectXmllintAccepts(output); }

    QString pack, output;
};

TEST_F(FlattenDeviceXmlTest, ExpandsIncludesAndMergesSections)
{
    // What, the files written beside the pack first, the pack, what it flattens to.
    const std::tuple<const char *, std::vector<std::pair<QString, QByteArray>>, QByteArray, QByteArray> rows[] = {
        {"IncludesEntityFilesBesideThePackAndDropsTheDoctype",
         {{u"keys.xml"_s, "<?xml version=\"1.0\"?>\n<include>\n  <keys><key code=\"1\"/></keys>\n</include>\n"},
          {u"sub/extra.xml"_s, "<include><extra/><more n=\"2\"/></include>"}},
         "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<!DOCTYPE devicepack [\n"
         "  <!ENTITY keys SYSTEM \"keys.xml\">\n  <!ENTITY extra SYSTEM \"sub/extra.xml\">\n"
         "  <!ENTITY name \"Phone &amp; Co\">\n]>\n"
         "<devicepack>\n  <display width=\"176\"/>\n  &keys;\n  <!-- &keys; in a comment stays -->\n"
         "  <misc label=\"&name;\">&extra;<![CDATA[&keys;]]></misc>\n</devicepack>\n",
         "<?xml version='1.0' encoding='UTF-8'?>\n<devicepack>\n <display width=\"176\"/>\n"
         " <keys>\n  <key code=\"1\"/>\n </keys>\n <!-- &keys; in a comment stays -->\n"
         " <misc label=\"Phone &amp; Co\">\n  <extra/>\n  <more n=\"2\"/><![CDATA[&keys;]]></misc>\n</devicepack>\n"},
        {"MergesSectionsOfTheSameNameInDocumentOrder",
         {{u"more.xml"_s, "<x><display><mode n=\"3\"/></display></x>"}},
         "<?xml version=\"1.0\"?>\n<!DOCTYPE pack [<!ENTITY more SYSTEM \"more.xml\">]>\n<pack>\n"
         "  <display a=\"first\"><mode n=\"1\"/>t&amp;t</display>\n  <keys><k/></keys>\n"
         "  <display a=\"second\"><mode n=\"2\"/><!--c--></display>\n  &more;\n  <keys/>\n</pack>\n",
         "<?xml version='1.0'?>\n<pack>\n <display a=\"first\">\n  <mode n=\"1\"/>t&amp;t<mode n=\"2\"/>\n"
         "  <!--c-->\n  <mode n=\"3\"/>\n </display>\n <keys>\n  <k/>\n </keys>\n</pack>\n"},
        // Without an XML declaration the doctype stays.
        {"PackWithoutXmlDeclarationKeepsItsDoctype",
         {{u"keys.xml"_s, "<i><keys/></i>"}},
         "<!DOCTYPE pack [<!ENTITY keys SYSTEM \"keys.xml\">]>\n<pack>&keys;</pack>\n",
         "<!DOCTYPE pack [\n<!ENTITY keys SYSTEM \"keys.xml\">\n]>\n<pack>\n <keys/>\n</pack>\n"},
        // "]>" further on belongs to the body, not to the declaration.
        {"DoctypeWithoutInternalSubsetStays",
         {},
         "<?xml version=\"1.0\"?>\n<!DOCTYPE pack SYSTEM \"pack.dtd\">\n<pack><!-- ]> --><a/></pack>\n",
         "<?xml version='1.0'?>\n<!DOCTYPE pack SYSTEM \"pack.dtd\">\n<pack>\n <!-- ]> -->\n <a/>\n</pack>\n"},
        // The declarations stay with the references, so the file stays well-formed.
        {"MissingOrMalformedIncludesKeepTheirReferences",
         {{u"broken.xml"_s, "<i><unclosed></i>"}, {u"good.xml"_s, "<i><good/></i>"}},
         "<?xml version=\"1.0\"?>\n<!DOCTYPE pack [\n<!ENTITY gone SYSTEM \"gone.xml\">\n"
         "<!ENTITY broken SYSTEM \"broken.xml\">\n<!ENTITY good SYSTEM \"good.xml\">\n]>\n"
         "<pack><a>&gone;</a><b>x&broken;y</b>&good;</pack>\n",
         "<?xml version='1.0'?>\n<!DOCTYPE pack [\n<!ENTITY broken SYSTEM \"broken.xml\">\n"
         "<!ENTITY gone SYSTEM \"gone.xml\">\n<!ENTITY good SYSTEM \"good.xml\">\n]>\n"
         "<pack>\n <a>&gone;</a>\n <b>x&broken;y</b>\n <good/>\n</pack>\n"}};
    for (const auto &[what, includes, source, expected] : rows) {
        SCOPED_TRACE(what);
        for (const auto &[name, bytes] : includes)
            Write(name, bytes);
        EXPECT_EQ(Flatten(Write(u"device.xml"_s, source)), expected);
        ExpectWellFormed();
    }
}

TEST_F(FlattenDeviceXmlTest, TextOutsideAsciiSurvivesAsCharacterReferences)
{
    Write(u"names.xml"_s, "<i><name>\xe6\x97\xa5\xe6\x9c\xac</name></i>");
    const QByteArray flattened = Flatten(
        Write(u"device.xml"_s,
              "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<!DOCTYPE pack [<!ENTITY names SYSTEM \"names.xml\">]>\n"
              "<pack title=\"Caf\xc3\xa9\">&names;<c><![CDATA[\xc3\xa9<\xf0\x9f\x98\x80>]]></c></pack>\n"));
    for (const char byte : flattened)
        ASSERT_LT(static_cast<unsigned char>(byte), 0x80u) << "not ASCII";
    ExpectWellFormed();

    QDomDocument document;
    ASSERT_TRUE(document.setContent(flattened));
    const QDomElement root = document.documentElement();
    EXPECT_EQ(root.attribute(u"title"_s), u"Caf\u00e9"_s);
    EXPECT_EQ(root.firstChildElement(u"name"_s).text(), u"\u65e5\u672c"_s);
    EXPECT_EQ(root.firstChildElement(u"c"_s).text(), QString::fromUtf8("\xc3\xa9<\xf0\x9f\x98\x80>"));
}

TEST_F(FlattenDeviceXmlTest, PacksInOtherEncodingsAreExpandedToo)
{
    if (!testutil::HaveProgram(u"iconv"_s))
        GTEST_SKIP() << "iconv is not installed";
    Write(u"keys.xml"_s, "<i><keys/></i>");
    const QByteArray utf8 = "<?xml version=\"1.0\" encoding=\"%1\"?>\n"
                            "<!DOCTYPE pack [<!ENTITY keys SYSTEM \"keys.xml\">]>\n"
                            "<pack name=\"T\xc3\xa9l\xc3\xa9phone\">&keys;</pack>\n";
    for (const char *encoding : {"ISO-8859-1", "UTF-16"}) {
        SCOPED_TRACE(encoding);
        const QString plain = Write(u"plain.xml"_s, QByteArray(utf8).replace("%1", encoding));
        QByteArray converted;
        ASSERT_EQ(testutil::RunProgram(u"iconv"_s, {u"-f"_s, u"UTF-8"_s, u"-t"_s, QString::fromLatin1(encoding), plain},
                                       &converted),
                  0);
        const QByteArray flattened = Flatten(Write(u"device.xml"_s, converted));
        EXPECT_TRUE(flattened.contains("<pack name=\"T&#xe9;l&#xe9;phone\">\n <keys/>\n</pack>"))
            << flattened.toStdString();
    }
}

TEST_F(FlattenDeviceXmlTest, FailsWithoutWritingOnBadSourceOrDestinationAndReadsRelativeSources)
{
    const QString good = Write(u"good.xml"_s, "<pack/>"), bad = Write(u"bad.xml"_s, "<pack><open></pack>");
    EXPECT_FALSE(FlattenDeviceXml(pack + u"/missing.xml"_s, output));
    EXPECT_FALSE(FlattenDeviceXml(u"missing-relative.xml"_s, output));
    EXPECT_FALSE(FlattenDeviceXml(bad, output));
    EXPECT_FALSE(FlattenDeviceXml(pack, output));
    EXPECT_FALSE(QFileInfo::exists(output));
    EXPECT_FALSE(FlattenDeviceXml(good, temp.path() + u"/no/such/folder/x.dso"_s));

    // A device or a pipe named by an entity is never read.
    EXPECT_TRUE(
        FlattenDeviceXml(Write(u"dev.xml"_s, "<!DOCTYPE p [<!ENTITY z SYSTEM \"/dev/zero\">]><p>&z;</p>"), output));
    EXPECT_TRUE(testutil::ReadFile(output).contains("<p>&z;</p>"));

    // A relative source is found from the current directory.
    Write(u"keys.xml"_s, "<i><keys/></i>");
    Write(u"device.xml"_s, "<!DOCTYPE p [<!ENTITY k SYSTEM \"keys.xml\">]><p>&k;</p>");
    testutil::CurrentDirectory cd(temp.path());
    ASSERT_TRUE(FlattenDeviceXml(u"pack/device.xml"_s, output));
    EXPECT_TRUE(testutil::ReadFile(output).contains("<p>\n <keys/>\n</p>"));
}

} // namespace
