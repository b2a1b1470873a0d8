#include "controllertest.h"

#include "support/kitbuilder.h"

#include <QDir>
#include <QRegularExpression>

namespace {

using controllertest::CatalogueModule;
using controllertest::MakeCatalogue;
using controllertest::ScriptedModule;
using harnesstest::CapturedLog;
using testutil::EnvGuard;
using testutil::ReadFile;
using testutil::WriteFile;

using Modules = QList<QSharedPointer<_TestModule>>;

QStringList Names(const Modules &modules)
{
    QStringList names;
    for (const QSharedPointer<_TestModule> &module : modules)
        names.append(module->moduleName);
    return names;
}

// ---- Feature lists over catalogues held in memory ----

class FeatureListTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(m_dir.isValid());
        m_harness.SetLogger(m_log.log());
        m_kit = MakeCatalogue(m_dir.filePath(QStringLiteral("kit")), false,
                              {CatalogueModule(QStringLiteral("Foo"), QStringLiteral("#1"), {}),
                               CatalogueModule(QStringLiteral("Bar"), QStringLiteral("#2"), {}),
                               CatalogueModule(QStringLiteral("Lib"), QStringLiteral("#3"), {},
                                               QString(), QStringLiteral("secondary"))});
        m_platform = MakeCatalogue(m_dir.filePath(QStringLiteral("platform")), true,
                                   {CatalogueModule(QStringLiteral("Shell"), QStringLiteral("#4"), {}),
                                    CatalogueModule(QStringLiteral("FooPlus"), QStringLiteral("#5"), {})});
        HarnessControllerAccess::SetCatalogues(m_harness, m_kit, m_platform);
    }

    QString Features(const QByteArray &xml)
    {
        const QString path = m_dir.filePath(QStringLiteral("features.xml"));
        WriteFile(path, xml);
        return path;
    }

    QTemporaryDir m_dir;
    CapturedLog m_log;
    Harness m_harness;
    QSharedPointer<Manifest> m_kit;
    QSharedPointer<Manifest> m_platform;
};

TEST_F(FeatureListTest, FeatureWithoutTestModuleAttributeSelectsNothing)
{
    Modules modules{QSharedPointer<_TestModule>(new ScriptedModule(QStringLiteral("stale")))};
    const QString path = Features("<features><feature testModule=\"Bar\"/>"
                                  "<feature name=\"no module\"/></features>");
    EXPECT_EQ(m_harness.GetTestModules(modules, path), 1u);
    EXPECT_EQ(Names(modules), QStringList{QStringLiteral("Bar")});
    EXPECT_FALSE(m_log.Text().contains(QStringLiteral("Warning")));
}

TEST_F(FeatureListTest, NamesMatchInAnyLetterCaseAtAnyDepth)
{
    const QString path = Features("<root><group><sub><feature testModule=\"foo\"/></sub></group>"
                                  "<Feature testModule=\"SHELL\"/></root>");
    Modules modules;
    EXPECT_EQ(m_harness.GetTestModules(modules, path), 2u);
    EXPECT_EQ(Names(modules), (QStringList{QStringLiteral("Foo"), QStringLiteral("Shell")}));
    EXPECT_FALSE(m_log.Text().contains(QStringLiteral("Warning")));
}

TEST_F(FeatureListTest, DeeplyNestedFeatureIsFoundAndRootFeatureCounts)
{
    constexpr int kDepth = 3000;
    QByteArray xml = "<feature testModule=\"Bar\">";
    for (int i = 0; i < kDepth; ++i)
        xml += "<g>";
    xml += "<feature testModule=\"Shell\"/>";
    for (int i = 0; i < kDepth; ++i)
        xml += "</g>";
    xml += "<feature testModule=\"Foo\"/></feature>";
    Modules modules;
    EXPECT_EQ(m_harness.GetTestModules(modules, Features(xml)), 3u);
    EXPECT_EQ(Names(modules),
              (QStringList{QStringLiteral("Bar"), QStringLiteral("Foo"), QStringLiteral("Shell")}));
}

TEST_F(FeatureListTest, UnknownNamesAreWarnedOneByOne)
{
    const QString path = Features("<f><feature testModule=\"Ghost\"/><feature testModule=\"Bar\"/>"
                                  "<feature testModule=\"Lib\"/><feature testModule=\"Fo*\"/></f>");
    Modules modules;
    EXPECT_EQ(m_harness.GetTestModules(modules, path), 3u);
    EXPECT_EQ(Names(modules),
              (QStringList{QStringLiteral("Bar"), QStringLiteral("Foo"), QStringLiteral("FooPlus")}));
    const QString log = m_log.Text();
    EXPECT_TRUE(log.contains(
        QStringLiteral("   Warning: Testmodule \"Ghost\" not found in test manifests.")));
    // A secondary module is never selected, and a pattern is not a module name.
    EXPECT_TRUE(
        log.contains(QStringLiteral("   Warning: Testmodule \"Lib\" not found in test manifests.")));
    EXPECT_TRUE(
        log.contains(QStringLiteral("   Warning: Testmodule \"Fo*\" not found in test manifests.")));
    EXPECT_FALSE(log.contains(QStringLiteral("\"Bar\"")));
}

TEST_F(FeatureListTest, PlatformOnlySelectionDrawsOnThePlatformCatalogue)
{
    HarnessControllerAccess::SetKitNotSelected(m_harness, true);
    const QString path = Features("<f><feature testModule=\"Foo\"/><feature testModule=\"FooPlus\"/></f>");
    Modules modules;
    EXPECT_EQ(m_harness.GetTestModules(modules, path), 1u);
    EXPECT_EQ(Names(modules), QStringList{QStringLiteral("FooPlus")});
    EXPECT_TRUE(
        m_log.Text().contains(QStringLiteral("   Warning: Testmodule \"Foo\" not found in test manifests.")));

    Modules filtered;
    EXPECT_EQ(m_harness.GetTestModules(filtered, QStringList{QStringLiteral("*")}, QString(), QString()),
              2u);
    EXPECT_EQ(Names(filtered), (QStringList{QStringLiteral("FooPlus"), QStringLiteral("Shell")}));
}

TEST_F(FeatureListTest, FilterSelectionAppendsKitThenPlatform)
{
    Modules modules{QSharedPointer<_TestModule>(new ScriptedModule(QStringLiteral("kept")))};
    EXPECT_EQ(m_harness.GetTestModules(modules, QStringList{QStringLiteral("foo*")}, QString(),
                                       QString()),
              3u);
    EXPECT_EQ(Names(modules),
              (QStringList{QStringLiteral("kept"), QStringLiteral("Foo"), QStringLiteral("FooPlus")}));
}

struct BadFeatureFile
{
    const char *name;
    const char *content; // null: no file at all
    const char *message; // %1 is the file's path
};

class BadFeatureFileTest : public FeatureListTest, public ::testing::WithParamInterface<BadFeatureFile>
{
};

TEST_P(BadFeatureFileTest, SelectsNothingAndSaysWhy)
{
    const BadFeatureFile &c = GetParam();
    QString path = m_dir.filePath(QStringLiteral("missing.xml"));
    if (c.content)
        path = Features(c.content);
    Modules modules{QSharedPointer<_TestModule>(new ScriptedModule(QStringLiteral("stale")))};
    EXPECT_EQ(m_harness.GetTestModules(modules, path), 0u);
    EXPECT_TRUE(modules.isEmpty());
    EXPECT_TRUE(m_log.Text().contains(QString::fromLatin1(c.message).arg(path))) << m_log.Text().toStdString();
}

INSTANTIATE_TEST_SUITE_P(
    Files, BadFeatureFileTest,
    ::testing::Values(BadFeatureFile{"Missing", nullptr, "BFS File %1 not found."},
                      BadFeatureFile{"Malformed", "<features><feature testModule=\"Foo\">",
                                     "Error Parsing BFS File %1, Error:"},
                      BadFeatureFile{"NoFeatures", "<features><module name=\"Foo\"/></features>",
                                     "No testcases in BFS File %1."}),
    [](const ::testing::TestParamInfo<BadFeatureFile> &info) { return info.param.name; });

TEST_F(FeatureListTest, ParseErrorNamesLineAndColumn)
{
    const QString path = Features("<features>\n  <feature testModule=\"Foo\">\n</feature2>");
    Modules modules;
    m_harness.GetTestModules(modules, path);
    const QRegularExpression message(
        QStringLiteral("Error Parsing BFS File .*features\\.xml, Error:.+ Line:3 Column:\\d+"));
    EXPECT_TRUE(message.match(m_log.Text()).hasMatch()) << m_log.Text().toStdString();
}

// ---- Catalogues of real kits ----

class CatalogueSetupTest : public ::testing::Test
{
protected:
    CatalogueSetupTest()
        : m_env("KESTIX_DATA_ROOT", m_dir.filePath(QStringLiteral("data"))),
          m_kit(m_dir.filePath(QStringLiteral("kit"))),
          m_platform(m_dir.filePath(QStringLiteral("platform/pvs/platform")))
    {
    }

    void SetUp() override
    {
        ASSERT_TRUE(m_dir.isValid());
        m_harness.SetLogger(m_log.log());
        m_kit.AddSourceModule(QStringLiteral("tests/audio"), Module(QStringLiteral("Audio")));
        m_kit.AddFrameworkPackage(QStringLiteral("testframeworks"), QStringLiteral("ctf"),
                                  QStringLiteral("Win32"), QStringLiteral("Debug"));
        m_platform.AddSourceModule(QStringLiteral("tests/shell"), Module(QStringLiteral("Shell")));
        ASSERT_TRUE(m_kit.Ok() && m_platform.Ok());
    }

    static kitbuilder::Module Module(const QString &name)
    {
        kitbuilder::Module module;
        module.kind = QStringLiteral("ctf");
        module.name = name;
        module.testCases = {name + QStringLiteral("_a")};
        return module;
    }

    QString KitPath() const { return m_dir.filePath(QStringLiteral("kit")); }
    QString PlatformSetting() const { return m_dir.filePath(QStringLiteral("platform")); }
    QString PlatformPath() const { return m_dir.filePath(QStringLiteral("platform/pvs/platform")); }

    QTemporaryDir m_dir;
    EnvGuard m_env;
    kitbuilder::KitBuilder m_kit;
    kitbuilder::KitBuilder m_platform;
    CapturedLog m_log;
    Harness m_harness;
};

TEST_F(CatalogueSetupTest, StaleKitCacheIsRegeneratedAndTheDefaultDevicePackTaken)
{
    // A cache of format version 4 is out of date.
    {
        Manifest old(KitPath(), false);
        WriteFile(old.ManifestFilePath(), "<testkit version=\"4\"><testmodules/></testkit>");
    }
    m_harness.SetTestkit(KitPath());
    m_harness.SetPlatform(PlatformSetting());
    Modules modules;
    EXPECT_EQ(m_harness.GetTestModules(modules, QStringList(), QString(), QString()), 2u);
    EXPECT_EQ(Names(modules), (QStringList{QStringLiteral("Audio"), QStringLiteral("Shell")}));

    const QString log = m_log.Text();
    const int outOfDate = log.indexOf(QStringLiteral("Manifest out of date for ") + KitPath());
    const int generating = log.indexOf(QStringLiteral("Generating manifest for ") + KitPath());
    ASSERT_GE(outOfDate, 0) << log.toStdString();
    EXPECT_GT(generating, outOfDate);
    EXPECT_TRUE(log.contains(QStringLiteral("Generating manifest for ") + PlatformPath()));
    EXPECT_TRUE(log.contains(QStringLiteral("Using the default device pack.")));
    EXPECT_TRUE(log.contains(
        QStringLiteral("DPK %1/testframeworks/oat/tools/reference/deviceref.dso is not valid.\n")
            .arg(PlatformPath())));

    // The next harness reads both caches and generates nothing.
    CapturedLog second;
    Harness again;
    again.SetLogger(second.log());
    again.SetTestkit(KitPath());
    again.SetPlatform(PlatformSetting());
    Modules more;
    EXPECT_EQ(again.GetTestModules(more, QStringList{QStringLiteral("audio")}, QString(), QString()), 1u);
    EXPECT_FALSE(second.Text().contains(QStringLiteral("Generating manifest")));
}

TEST_F(CatalogueSetupTest, DevicePackGivenBeforehandIsKept)
{
    const QString pack = m_dir.filePath(QStringLiteral("mine.dso"));
    WriteFile(pack, "<dso/>");
    m_harness.SetDPK(pack);
    m_harness.SetTestkit(KitPath());
    m_harness.SetPlatform(PlatformSetting());
    Modules modules;
    m_harness.GetTestModules(modules, QStringList(), QString(), QString());
    EXPECT_FALSE(m_log.Text().contains(QStringLiteral("Using the default device pack.")));
    EXPECT_EQ(HarnessControllerAccess::Environment(m_harness).value(QStringLiteral("DevicePack")),
              QDir::cleanPath(pack));
}

TEST_F(CatalogueSetupTest, GenerateManifestWritesEachCatalogueToItsCache)
{
    m_harness.SetTestkit(KitPath());
    m_harness.SetPlatform(PlatformSetting());
    EXPECT_TRUE(m_harness.GenerateManifest(QString()));
    Manifest kit(KitPath(), false);
    Manifest platform(PlatformPath(), true);
    const QString log = m_log.Text();
    EXPECT_TRUE(log.contains(QStringLiteral("Manifest written to ") + kit.ManifestFilePath()));
    EXPECT_TRUE(log.contains(QStringLiteral("Manifest written to ") + platform.ManifestFilePath()));
    EXPECT_TRUE(kit.ReadManifest());
    EXPECT_TRUE(kit.FindTestModule(QStringLiteral("audio")));
    EXPECT_TRUE(HarnessControllerAccess::Kit(m_harness));
    EXPECT_TRUE(HarnessControllerAccess::Platform(m_harness));
}

TEST_F(CatalogueSetupTest, GenerateManifestToARelativePathCreatesItsFolder)
{
    testutil::CurrentDirectory cwd(m_dir.path());
    m_harness.SetTestkit(KitPath());
    EXPECT_TRUE(m_harness.GenerateManifest(QStringLiteral("out/sub/kit.xml")));
    const QString written = m_dir.filePath(QStringLiteral("out/sub/kit.xml"));
    EXPECT_TRUE(m_log.Text().contains(QStringLiteral("Manifest ") + KitPath() +
                                      QStringLiteral(" written to ") + written));
    QDomDocument document;
    ASSERT_TRUE(document.setContent(ReadFile(written)));
    EXPECT_EQ(document.documentElement().tagName(), QStringLiteral("testkit"));
}

TEST_F(CatalogueSetupTest, GenerateManifestFallsBackToTheHomeFolder)
{
    const QString home = m_dir.filePath(QStringLiteral("home"));
    QDir().mkpath(home);
    EnvGuard homeGuard("HOME", home);
    // A regular file stands where the output folder should be.
    WriteFile(m_dir.filePath(QStringLiteral("blocked")), "x");
    m_harness.SetTestkit(KitPath());
    m_harness.SetPlatform(PlatformSetting());
    EXPECT_TRUE(m_harness.GenerateManifest(m_dir.filePath(QStringLiteral("blocked/kits.xml"))));

    const QString fallback = QDir::cleanPath(home + QStringLiteral("/kits.xml"));
    EXPECT_TRUE(m_log.Text().contains(QStringLiteral("Manifest ") + PlatformPath() +
                                      QStringLiteral(" written to ") + fallback));
    // Both catalogues went to the one file; the platform's came last.
    Manifest platform(PlatformPath(), true);
    QDomDocument document;
    ASSERT_TRUE(document.setContent(ReadFile(fallback)));
    EXPECT_EQ(document.documentElement().attribute(QStringLiteral("path")), platform.kitPath);
}

TEST_F(CatalogueSetupTest, GenerateManifestWithoutAnyWritableFileFails)
{
    WriteFile(m_dir.filePath(QStringLiteral("blocked")), "x");
    EnvGuard homeGuard("HOME", m_dir.filePath(QStringLiteral("blocked/home")));
    m_harness.SetTestkit(KitPath());
    EXPECT_FALSE(m_harness.GenerateManifest(m_dir.filePath(QStringLiteral("blocked/kits.xml"))));
    EXPECT_TRUE(m_log.Text().contains(QStringLiteral("Manifest can't be opened for writing.")));
}

} // namespace
