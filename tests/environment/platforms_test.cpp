#include "environment/platforms.h"

#include "support/testutil.h"

#include <QDir>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

class PlatformsTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(temp.isValid());
        root = temp.path() + u"/platforms"_s;
        kits = temp.path() + u"/Tests"_s;
        env.Unset("KESTIX_PLATFORMS_ALL");
        env.Unset("KESTIX_PLATFORM");
        env.Unset("KESTIX_TESTSETS_ALL");
        env.Unset("KESTIX_TESTSET");
    }

    void MakeDirs(const QString &parent, const QStringList &names)
    {
        for (const QString &name : names)
            ASSERT_TRUE(QDir().mkpath(parent + u'/' + name));
    }

    QTemporaryDir temp;
    QString root;
    QString kits;
    testutil::EnvGuard env;
};

QStringList Names(const QList<Platform> &platforms)
{
    QStringList names;
    for (const Platform &platform : platforms)
        names << platform.name;
    return names;
}

TEST_F(PlatformsTest, NoPlatformsRootListsNothingAndClearsTheList)
{
    QList<Platform> platforms{Platform()};
    EXPECT_EQ(GetPlatforms(platforms), 0u);
    EXPECT_TRUE(platforms.isEmpty());
}

TEST_F(PlatformsTest, ListsSubDirectoriesByNameStrippingTheProWord)
{
    MakeDirs(root, {"Product", "Foo Pro", "abc", "Pro", "My Project", "Bar PRO 2", "zed"});
    testutil::WriteFile(root + u"/notes.txt"_s, "not a platform");
    env.Set("KESTIX_PLATFORMS_ALL", root);

    QList<Platform> platforms;
    ASSERT_EQ(GetPlatforms(platforms), 7u);

    struct Expected
    {
        const char *entry;
        const char *name;
        bool pro;
    };
    const Expected expected[] = {
        {"abc", "abc", false},    {"Bar PRO 2", "Bar 2", true},
        {"Foo Pro", "Foo", true}, {"My Project", "My Project", true},
        {"Pro", "Pro", true},     {"Product", "Product", true},
        {"zed", "zed", false},
    };
    for (int i = 0; i < 7; ++i) {
        SCOPED_TRACE(expected[i].entry);
        EXPECT_EQ(platforms[i].name, QString::fromUtf8(expected[i].name));
        EXPECT_EQ(platforms[i].path, root + u'/' + QString::fromUtf8(expected[i].entry));
        EXPECT_EQ(platforms[i].isPro, expected[i].pro);
        EXPECT_FALSE(platforms[i].isDefault);
    }
}

TEST_F(PlatformsTest, DefaultPlatformIsMatchedIgnoringCase)
{
    MakeDirs(root, {"abc", "Foo Pro"});
    env.Set("KESTIX_PLATFORMS_ALL", root);
    env.Set("KESTIX_PLATFORM", (root + u"/ABC/"_s).toUpper());

    QList<Platform> platforms;
    ASSERT_EQ(GetPlatforms(platforms), 2u);
    EXPECT_TRUE(platforms[0].isDefault);
    EXPECT_FALSE(platforms[1].isDefault);

    // A root written with a trailing separator still finds its default.
    env.Set("KESTIX_PLATFORMS_ALL", root + u'/');
    env.Set("KESTIX_PLATFORM", root + u"/Foo Pro/bin"_s);
    ASSERT_EQ(GetPlatforms(platforms), 2u);
    EXPECT_EQ(platforms[1].path, root + u"//Foo Pro"_s);
    EXPECT_FALSE(platforms[0].isDefault);
    EXPECT_TRUE(platforms[1].isDefault);

    // A setting without a separator names no platform.
    env.Set("KESTIX_PLATFORM", u"abc"_s);
    ASSERT_EQ(GetPlatforms(platforms), 2u);
    EXPECT_FALSE(platforms[0].isDefault);
}

TEST_F(PlatformsTest, ProAndNonProListsAppendWithoutClearing)
{
    MakeDirs(root, {"abc", "Foo Pro", "Pro", "zed"});
    env.Set("KESTIX_PLATFORMS_ALL", root);

    QList<Platform> pro;
    EXPECT_EQ(GetProPlatforms(pro), 2u);
    EXPECT_EQ(GetProPlatforms(pro), 4u);
    EXPECT_EQ(Names(pro), QStringList({"Foo", "Pro", "Foo", "Pro"}));

    QList<Platform> mixed = pro.mid(0, 1);
    EXPECT_EQ(GetNonProPlatforms(mixed), 3u);
    EXPECT_EQ(Names(mixed), QStringList({"Foo", "abc", "zed"}));

    env.Unset("KESTIX_PLATFORMS_ALL");
    EXPECT_EQ(GetProPlatforms(mixed), 3u);
}

struct DefaultPlatformCase
{
    const char *setting;
    bool found;
    const char *path;
};

class DefaultPlatformTest : public ::testing::TestWithParam<DefaultPlatformCase>
{
};

TEST_P(DefaultPlatformTest, CutsAtLastBackslashThenLastSlash)
{
    testutil::EnvGuard env("KESTIX_PLATFORM", QString::fromUtf8(GetParam().setting));
    QString out = u"stale"_s;
    EXPECT_EQ(GetDefaultPlatform(out), GetParam().found);
    EXPECT_EQ(out, QString::fromUtf8(GetParam().path));
}

INSTANTIATE_TEST_SUITE_P(
    Settings, DefaultPlatformTest,
    ::testing::Values(DefaultPlatformCase{"", false, ""},
                      DefaultPlatformCase{"C:\\sdk\\platforms\\abc\\", true, "C:\\sdk\\platforms\\abc"},
                      DefaultPlatformCase{"C:\\sdk\\platforms\\abc", true, "C:\\sdk\\platforms"},
                      DefaultPlatformCase{"/opt/sdk/abc/", true, "/opt/sdk/abc"},
                      DefaultPlatformCase{"/opt/sdk/abc", true, "/opt/sdk"},
                      // A backslash anywhere wins over later forward slashes.
                      DefaultPlatformCase{"a/b\\c/d", true, "a/b"}, DefaultPlatformCase{"abc", true, "abc"}));

TEST_F(PlatformsTest, TestKitsDefaultToTestsBesidePlatformsRoot)
{
    MakeDirs(root, {"abc"});
    MakeDirs(kits, {"kitB", "kitA"});
    env.Set("KESTIX_PLATFORMS_ALL", root + u'/');

    EXPECT_EQ(GetTestSetsRoot(), kits);
    QList<TestKit> found{TestKit()};
    ASSERT_EQ(GetTestKits(found), 2u);
    EXPECT_EQ(found[0].name, u"kitA"_s);
    EXPECT_EQ(found[0].path, kits + u"/kitA"_s);
    EXPECT_EQ(found[0].type, TestKit::TEST_KIT);
    EXPECT_FALSE(found[0].reserved);
    EXPECT_EQ(found[1].name, u"kitB"_s);

    // An explicit root takes precedence and is cleaned.
    const QString other = temp.path() + u"/other"_s;
    MakeDirs(other, {"only"});
    env.Set("KESTIX_TESTSETS_ALL", other + u"/./"_s);
    ASSERT_EQ(GetTestKits(found), 1u);
    EXPECT_EQ(found[0].path, other + u"/only"_s);
}

TEST_F(PlatformsTest, DefaultTestKitIsTheNamedOneExactly)
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
}

TEST_F(PlatformsTest, TestSetEndingInSeparatorPicksTheGreatestName)
{
    // Ordinal comparison: lower-case names sort after upper-case ones.
    MakeDirs(kits, {"alpha", "Zeta", "beta"});
    env.Set("KESTIX_TESTSETS_ALL", kits);
    env.Set("KESTIX_TESTSET", kits + u'/');
    EXPECT_EQ(GetDefaultTestKitName(), QString());

    TestKit kit;
    ASSERT_TRUE(GetDefaultTestKit(kit));
    EXPECT_EQ(kit.name, u"beta"_s);

    // Whatever out held before does not change the choice.
    TestKit prefilled;
    prefilled.name = u"zzz"_s;
    ASSERT_TRUE(GetDefaultTestKit(prefilled));
    EXPECT_EQ(prefilled.name, u"beta"_s);
}

TEST(TestKitNames, DefaultTestKitNameIsTheLastComponent)
{
    testutil::EnvGuard env;
    const std::pair<const char *, const char *> cases[]
        = {{"", ""}, {"kit", "kit"}, {"/a/b/kit", "kit"}, {"C:\\a\\kit", "kit"}, {"a\\kit/x", "kit/x"}, {"/a/b/", ""}};
    for (const auto &[setting, name] : cases) {
        env.Set("KESTIX_TESTSET", QString::fromUtf8(setting));
        EXPECT_EQ(GetDefaultTestKitName(), QString::fromUtf8(name)) << setting;
    }
}

TEST(TestKitNames, TypeNames)
{
    EXPECT_EQ(TestKit::TypeToName(TestKit::USER_KIT), u"User Kit"_s);
    EXPECT_EQ(TestKit::TypeToName(TestKit::TEST_KIT), u"Test Kit"_s);
    EXPECT_EQ(TestKit::TypeToName(TestKit::PVS_KIT), u"Pvs Kit"_s);
    EXPECT_EQ(TestKit::TypeToName(static_cast<TestKit::KitType>(7)), u"unknown"_s);
    EXPECT_EQ(TestKit::TypeToName(static_cast<TestKit::KitType>(-1)), u"unknown"_s);
}

TEST(EnvironmentReaders, EmptyTestSetsRootFallsBackBesidePlatforms)
{
    testutil::EnvGuard env;
    env.Set("KESTIX_PLATFORMS_ALL", u"/sdk/./platforms"_s);
    env.Set("KESTIX_TESTSETS_ALL", u"/kits/../kits"_s);
    EXPECT_EQ(GetTestSetsRoot(), u"/kits/../kits"_s);
    env.Set("KESTIX_TESTSETS_ALL", QString());
    EXPECT_EQ(GetTestSetsRoot(), u"/sdk/Tests"_s);
}

struct PackageCase
{
    const char *package;
    bool split;
    const char *first;
    const char *middle;
    const char *last;
};

class BreakPackageNameTest : public ::testing::TestWithParam<PackageCase>
{
};

TEST_P(BreakPackageNameTest, Splits)
{
    const PackageCase &c = GetParam();
    // Too few parts leave the outputs as they were; callers pass first empty.
    QString first, middle = u"2"_s, last = u"3"_s;
    EXPECT_EQ(BreakPackageName(QString::fromUtf8(c.package), first, middle, last), c.split);
    EXPECT_EQ(first, QString::fromUtf8(c.first));
    EXPECT_EQ(middle, QString::fromUtf8(c.middle));
    EXPECT_EQ(last, QString::fromUtf8(c.last));
}

INSTANTIATE_TEST_SUITE_P(
    Names, BreakPackageNameTest,
    ::testing::Values(PackageCase{"my_mod_RVCT22arm9_Release.kestix", true, "my_mod", "RVCT22arm9", "Release"},
                      PackageCase{"mod_GCCE_UDEB.KESTIX", true, "mod", "GCCE", "UDEB"},
                      PackageCase{"a__b_c", true, "a", "b", "c"}, PackageCase{"x_y__b_c", true, "x_y", "b", "c"},
                      PackageCase{"_b_c", true, "", "b", "c"}, PackageCase{"a_b_", true, "a", "b", ""},
                      PackageCase{"a.kestix_b.kestix_c.kestix", true, "a", "b", "c"},
                      PackageCase{"a_b.kestix", false, "", "2", "3"}, PackageCase{"plain", false, "", "2", "3"},
                      PackageCase{"", false, "", "2", "3"}));

} // namespace
