#include "controllertest.h"

#include "support/kitbuilder.h"

#include <QDir>
#include <QRegularExpression>

namespace {

using Modules = QList<QSharedPointer<_TestModule>>;
using testutil::ModuleNames;

class FeatureListTest : public CatalogueHarnessTest
{
protected:
    void SetUp() override
    {
        UseCatalogues({CatalogueModule(u"Foo"_s, u"#1"_s, {}), CatalogueModule(u"Bar"_s, u"#2"_s, {}),
                       CatalogueModule(u"Lib"_s, u"#3"_s, {}, QString(), u"secondary"_s)},
                      {CatalogueModule(u"Shell"_s, u"#4"_s, {}), CatalogueModule(u"FooPlus"_s, u"#5"_s, {})});
    }

    QString Features(const QByteArray &xml)
    {
        const QString path = m_dir.filePath(u"features.xml"_s);
        WriteFile(path, xml);
        return path;
    }
};

TEST_F(FeatureListTest, FeaturesSelectTheirModulesAndUnknownNamesAreWarnedOneByOne)
{
    // Nested 3000 levels deep, below a feature that counts itself.
    const QByteArray deep = "<feature testModule=\"Bar\">" + QByteArray("<g>").repeated(3000)
        + "<feature testModule=\"Shell\"/>" + QByteArray("</g>").repeated(3000)
        + "<feature testModule=\"Foo\"/></feature>";
    const struct
    {
        QByteArray xml;
        QStringList selected, warned;
    } rows[] = {{"<features><feature testModule=\"Bar\"/><feature name=\"no module\"/></features>", {u"Bar"_s}, {}},
                // Any letter case, any depth.
                {"<root><group><sub><feature testModule=\"foo\"/></sub></group><Feature testModule=\"SHELL\"/></root>",
                 {u"Foo"_s, u"Shell"_s},
                 {}},
                // A secondary module is never selected, and a pattern is not a module name.
                {"<f><feature testModule=\"Ghost\"/><feature testModule=\"Bar\"/>"
                 "<feature testModule=\"Lib\"/><feature testModule=\"Fo*\"/></f>",
                 {u"Bar"_s, u"Foo"_s, u"FooPlus"_s},
                 {u"Ghost"_s, u"Lib"_s, u"Fo*"_s}},
                {deep, {u"Bar"_s, u"Foo"_s, u"Shell"_s}, {}}};
    for (const auto &row : rows) {
        SCOPED_TRACE(row.xml.left(200).toStdString());
        const qsizetype logged = m_log.Text().size();
        Modules modules{QSharedPointer<_TestModule>(new ScriptedModule(u"stale"_s))};
        EXPECT_EQ(m_harness.GetTestModules(modules, Features(row.xml)), uint(row.selected.size()));
        EXPECT_EQ(ModuleNames(modules), row.selected);
        QString expected;
        for (const QString &name : row.warned)
            expected += u"   Warning: Testmodule \"%1\" not found in test manifests."_s.arg(name);
        EXPECT_EQ(m_log.Text().mid(logged), expected);
    }
}

TEST_F(FeatureListTest, FilterSelectionAppendsKitThenPlatformAndAPlatformOnlySelectionDrawsOnThePlatformAlone)
{
    Modules kept{QSharedPointer<_TestModule>(new ScriptedModule(u"kept"_s))};
    EXPECT_EQ(m_harness.GetTestModules(kept, QStringList{u"foo*"_s}, QString(), QString()), 3u);
    EXPECT_EQ(ModuleNames(kept), (QStringList{u"kept"_s, u"Foo"_s, u"FooPlus"_s}));

    HarnessTestAccess::SetKitNotSelected(m_harness, true);
    const QString path = Features("<f><feature testModule=\"Foo\"/><feature testModule=\"FooPlus\"/></f>");
    Modules modules;
    EXPECT_EQ(m_harness.GetTestModules(modules, path), 1u);
    EXPECT_EQ(ModuleNames(modules), QStringList{u"FooPlus"_s});
    EXPECT_TRUE(m_log.Text().contains(u"   Warning: Testmodule \"Foo\" not found in test manifests."_s));

    Modules filtered;
    EXPECT_EQ(m_harness.GetTestModules(filtered, QStringList{u"*"_s}, QString(), QString()), 2u);
    EXPECT_EQ(ModuleNames(filtered), (QStringList{u"FooPlus"_s, u"Shell"_s}));
}

TEST_F(FeatureListTest, BadFeatureFilesSelectNothingAndSayWhy)
{
    // Content (null: no file at all), the message as a pattern where %1 is the file's path.
    const char *rows[][2]
        = {{nullptr, "BFS File %1 not found\\."},
           {"<features><feature testModule=\"Foo\">", "Error Parsing BFS File %1, Error:.+ Line:1 Column:\\d+"},
           {"<features>\n<feature testModule=\"Foo\">\n</x>", "Error Parsing BFS File %1, Error:.+ Line:3 Column:\\d+"},
           {"<features><module name=\"Foo\"/></features>", "No testcases in BFS File %1\\."}};
    for (const auto &row : rows) {
        SCOPED_TRACE(row[1]);
        const QString path = row[0] ? Features(row[0]) : m_dir.filePath(u"missing.xml"_s);
        Modules modules{QSharedPointer<_TestModule>(new ScriptedModule(u"stale"_s))};
        EXPECT_EQ(m_harness.GetTestModules(modules, path), 0u);
        EXPECT_TRUE(modules.isEmpty());
        const QRegularExpression message(QString::fromLatin1(row[1]).arg(QRegularExpression::escape(path)));
        EXPECT_TRUE(message.match(m_log.Text()).hasMatch()) << m_log.Text().toStdString();
    }
}

class CatalogueSetupTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        m_harness.SetLogger(m_log.log());
        m_run.Kit().AddSourceModule(u"tests/audio"_s, Module(u"Audio"_s));
        m_run.Kit().AddFrameworkPackage(u"testframeworks"_s, u"ctf"_s, u"Win32"_s, u"Debug"_s);
        m_platform.AddSourceModule(u"tests/shell"_s, Module(u"Shell"_s));
        ASSERT_TRUE(m_run.KitOk() && m_platform.Ok());
    }

    // A CTF module with one test case.
    static kitbuilder::Module Module(const QString &name)
    {
        kitbuilder::Module module;
        module.name = name;
        module.testCases = {name + u"_a"_s};
        return module;
    }

    QString KitPath() const { return m_run.Path(u"kit"_s); }
    void ChooseBoth(Harness &harness) const
    {
        harness.SetTestkit(KitPath());
        harness.SetPlatform(PlatformSetting());
    }
    QString PlatformSetting() const { return m_run.Path(u"platform"_s); }
    QString PlatformPath() const { return m_run.Path(u"platform/pvs/platform"_s); }

    KitRun m_run;
    kitbuilder::KitBuilder m_platform{PlatformPath()};
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
    ChooseBoth(m_harness);
    Modules modules;
    EXPECT_EQ(m_harness.GetTestModules(modules, QStringList(), QString(), QString()), 2u);
    EXPECT_EQ(ModuleNames(modules), (QStringList{u"Audio"_s, u"Shell"_s}));

    const QString log = m_log.Text();
    const int outOfDate = log.indexOf(u"Manifest out of date for "_s + KitPath());
    const int generating = log.indexOf(u"Generating manifest for "_s + KitPath());
    ASSERT_GE(outOfDate, 0) << log.toStdString();
    EXPECT_GT(generating, outOfDate);
    EXPECT_TRUE(log.contains(u"Generating manifest for "_s + PlatformPath()));
    EXPECT_TRUE(log.contains(u"Using the default device pack."_s));
    EXPECT_TRUE(
        log.contains(u"DPK %1/testframeworks/oat/tools/reference/deviceref.dso is not valid.\n"_s.arg(PlatformPath())));

    // The next harness reads both caches and generates nothing.
    CapturedLog second;
    Harness again;
    again.SetLogger(second.log());
    ChooseBoth(again);
    Modules more;
    EXPECT_EQ(again.GetTestModules(more, QStringList{u"audio"_s}, QString(), QString()), 1u);
    EXPECT_FALSE(second.Text().contains(u"Generating manifest"_s));

    // A kit without modules still leaves the platform's to run.
    ASSERT_TRUE(QDir().mkpath(m_run.Path(u"empty-kit"_s)));
    Harness platformOnly;
    platformOnly.SetLogger(second.log());
    platformOnly.SetTestkit(m_run.Path(u"empty-kit"_s));
    platformOnly.SetPlatform(PlatformSetting());
    Modules shell;
    EXPECT_EQ(platformOnly.GetTestModules(shell, QStringList(), QString(), QString()), 1u);
    EXPECT_EQ(ModuleNames(shell), QStringList{u"Shell"_s});
}

TEST_F(CatalogueSetupTest, DevicePackGivenBeforehandIsKeptAndGenerateManifestWritesEachCatalogueToItsCache)
{
    const QString pack = m_run.Path(u"mine.dso"_s);
    WriteFile(pack, "<dso/>");
    m_harness.SetDPK(pack);
    ChooseBoth(m_harness);
    Modules modules;
    m_harness.GetTestModules(modules, QStringList(), QString(), QString());
    EXPECT_FALSE(m_log.Text().contains(u"Using the default device pack."_s));
    EXPECT_EQ(HarnessTestAccess::Environment(m_harness).value(u"DevicePack"_s), QDir::cleanPath(pack));

    EXPECT_TRUE(m_harness.GenerateManifest(QString()));
    Manifest kit(KitPath(), false);
    Manifest platform(PlatformPath(), true);
    EXPECT_TRUE(m_log.Text().contains(u"Manifest written to "_s + kit.ManifestFilePath()));
    EXPECT_TRUE(m_log.Text().contains(u"Manifest written to "_s + platform.ManifestFilePath()));
    EXPECT_TRUE(kit.ReadManifest());
    EXPECT_TRUE(kit.FindTestModule(u"audio"_s));
}

TEST_F(CatalogueSetupTest, GenerateManifestCreatesTheFolderOfARelativePathOrFallsBackToTheHomeFolderOrFails)
{
    ChooseBoth(m_harness);
    {
        CurrentDirectory cwd(m_run.Path(u"."_s));
        EXPECT_TRUE(m_harness.GenerateManifest(u"out/sub/kit.xml"_s));
    }
    const QString written = m_run.Path(u"out/sub/kit.xml"_s);
    EXPECT_TRUE(m_log.Text().contains(u"Manifest "_s + KitPath() + u" written to "_s + written));
    QDomDocument document;
    ASSERT_TRUE(document.setContent(ReadFile(written)));
    EXPECT_EQ(document.documentElement().tagName(), u"testkit"_s);

    const QString home = m_run.Path(u"home"_s);
    QDir().mkpath(home);
    EnvGuard homeGuard("HOME", home);
    // A regular file stands where the output folder should be.
    WriteFile(m_run.Path(u"blocked"_s), "x");
    EXPECT_TRUE(m_harness.GenerateManifest(m_run.Path(u"blocked/kits.xml"_s)));

    const QString fallback = QDir::cleanPath(home + u"/kits.xml"_s);
    EXPECT_TRUE(m_log.Text().contains(u"Manifest "_s + PlatformPath() + u" written to "_s + fallback));
    // Both catalogues went to the one file; the platform's came last.
    Manifest platform(PlatformPath(), true);
    ASSERT_TRUE(document.setContent(ReadFile(fallback)));
    EXPECT_EQ(document.documentElement().attribute(u"path"_s), platform.kitPath);

    homeGuard.Set("HOME", m_run.Path(u"blocked/home"_s));
    EXPECT_FALSE(m_harness.GenerateManifest(m_run.Path(u"blocked/kits.xml"_s)));
    EXPECT_TRUE(m_log.Text().contains(u"Manifest can't be opened for writing."_s));
}

} // namespace
