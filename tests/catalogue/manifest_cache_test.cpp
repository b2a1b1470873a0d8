// The cached catalogue file and the queries on a catalogue.

#include "manifest_fixture.h"

#include "catalogue/framework.h"
#include "common/stringhash.h"
#include "modules/ctftestmodule.h"
#include "modules/oatframework.h"
#include "modules/oattestmodule.h"
#include "modules/secondarymodule.h"

#include <QFile>
#include <QFileInfo>

using namespace Qt::StringLiterals;

namespace {

using kitbuilder::Module;

class ManifestCacheTest : public ManifestFixture
{
protected:
    // A kit with a module of every kind, records in their packages, and
    // frameworks of both origins.
    void BuildRichKit()
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
    }

    // A cache file of the manifest's kit with the given root and entries.
    void WriteCache(const Manifest &manifest, const QByteArray &text) { testutil::WriteFile(manifest.cacheFile, text); }
};

TEST_F(ManifestCacheTest, CacheLivesInTheFolderNamedByTheCleanedKitPath)
{
    Manifest manifest(kit->Root() + u"/tests/../"_s, false);
    EXPECT_EQ(manifest.kitPath, kit->Root());
    EXPECT_EQ(manifest.RootHash(), StringHashName(kit->Root()));
    EXPECT_EQ(manifest.ManifestFilePath(),
              TempPath(u"data/Norvane/TestManifests/"_s) + manifest.RootHash() + u"/Manifest.xml"_s);
    EXPECT_EQ(manifest.ManifestCachePath(), manifest.ManifestFilePath());
    EXPECT_TRUE(QFileInfo(manifest.cacheDirectory).isDir());

    Manifest other(kit->Root() + u"/tests"_s, false);
    EXPECT_NE(other.cacheFile, manifest.cacheFile);
}

TEST_F(ManifestCacheTest, OnlyAFormatOfFiveOrLaterIsCurrent)
{
    Manifest manifest(kit->Root(), false);
    EXPECT_FALSE(manifest.IsVersionOkay()) << "no cache";
    EXPECT_FALSE(manifest.ReadManifest());
    const std::pair<const char *, bool> rows[] = {
        {"<testkit version='5'/>", true},
        {"<TestKit version='7' path='/elsewhere'/>", true},
        {"<testkit version='4'/>", false},
        {"<testkit/>", false},
        {"<testkit version='five'/>", false},
        {"<testkit version='-7'/>", false},
        {"<testkit version='99999999999'/>", false},
        {"<manifest version='5'/>", false},
        {"<testkit version='5'>", false},
        {"", false},
    };
    for (const auto &[text, current] : rows) {
        WriteCache(manifest, text);
        EXPECT_EQ(manifest.IsVersionOkay(), current) << text;
    }
}

TEST_F(ManifestCacheTest, StaleOrBrokenCacheIsReplacedByAScan)
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
        Manifest reread(kit->Root(), false);
        EXPECT_TRUE(reread.IsVersionOkay());
    }
}

TEST_F(ManifestCacheTest, ReadingKeepsKnownKindsAndNamedFrameworksOnly)
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
}

TEST_F(ManifestCacheTest, ReadingReplacesModulesButKeepsFrameworks)
{
    Manifest manifest(kit->Root(), false);
    WriteCache(manifest,
               "<testkit version='5'><testmodules><testmodule testtype='ctf' moduleName='A'/></testmodules>"
               "<frameworks><framework name='ctf'/></frameworks></testkit>");
    ASSERT_TRUE(manifest.ReadManifest());
    WriteCache(manifest,
               "<testkit version='5'><testmodules><testmodule testtype='ctf' moduleName='B'/></testmodules>"
               "<frameworks><framework name='oat'/></frameworks></testkit>");
    ASSERT_TRUE(manifest.ReadManifest());
    EXPECT_EQ(manifest.testModules.keys(), QStringList{"b"});
    EXPECT_EQ(manifest.frameworks.keys(), (QStringList{"ctf", "oat"}));
}

TEST_F(ManifestCacheTest, WrittenCatalogueReadsBackTheSame)
{
    BuildRichKit();
    Manifest scanned = ScanKit();
    ASSERT_EQ(scanned.testModules.keys(),
              (QStringList{"browser", "contacts", "helperlib", "menu", "prebuilt", "timer"}));

    Manifest read(kit->Root(), false);
    ASSERT_TRUE(read.IsVersionOkay());
    ASSERT_TRUE(read.ReadManifest());

    // What the scan found is really there; the kinds and hashes come back as
    // the byte comparison below shows.
    ASSERT_EQ(read.testModules.size(), scanned.testModules.size());
    const auto timer = read.FindTestModule(u"TIMER"_s).dynamicCast<CtfTestModule>();
    ASSERT_TRUE(timer);
    EXPECT_EQ(timer->classids, (QVector<unsigned int>{0x01020304, 0x01020305}));
    EXPECT_EQ(timer->ModuleName(), u"Timer_k"_s);
    const auto contacts = read.FindTestModule(u"contacts"_s).dynamicCast<OatTestModule>();
    ASSERT_TRUE(contacts);
    EXPECT_EQ(contacts->ModuleName(), u"Contacts"_s);
    EXPECT_EQ(read.FindTestModule(u"browser"_s)->applets.size(), 2);
    EXPECT_EQ(read.FindTestModule(u"contacts"_s)->baseLineFile, kit->Path(u"tests/pim/contacts/Contacts.baseline"_s));
    EXPECT_TRUE(read.FindTestModule(u"helperlib"_s).dynamicCast<SecondaryModule>());
    EXPECT_EQ(read.FindTestModule(u"menu"_s)->family, u"Menüs \u65e5\u672c"_s);

    QList<QSharedPointer<_Framework>> frameworks;
    ASSERT_EQ(read.GetFrameworks(frameworks), 2u);
    EXPECT_EQ(frameworks[0]->name, u"ctf"_s);
    EXPECT_TRUE(frameworks[1].dynamicCast<_OatFramework>());

    // Everything, including the kinds' own elements, survives: the read
    // catalogue writes the same bytes, except for the empty "data" marks of
    // program records, whose bytes the manifest never holds.
    const QString again = TempPath(u"again.xml"_s);
    ASSERT_TRUE(read.WriteManifest(again));
    QByteArray expected = testutil::ReadFile(scanned.cacheFile);
    ASSERT_TRUE(expected.contains("<data/>"));
    expected.replace("     <data/>\n", "");
    EXPECT_EQ(testutil::ReadFile(again), expected);
}

// The tool scans in a process of its own, with its own hash seed: the
// catalogue it writes must hold the same bytes.
TEST_F(ManifestCacheTest, WrittenCacheIsWellFormedXmlAndTheSameInAnotherProcess)
{
    BuildRichKit();
    Manifest manifest = ScanKit();

    const QByteArray bytes = testutil::ReadFile(manifest.cacheFile);
    EXPECT_TRUE(bytes.startsWith("<testkit ")) << "no XML declaration";
    QDomDocument document;
    ASSERT_TRUE(document.setContent(bytes));
    const QDomElement root = document.documentElement();
    EXPECT_EQ(root.attribute(u"version"_s), u"5"_s);
    EXPECT_EQ(root.attribute(u"path"_s), kit->Root());
    EXPECT_EQ(root.attribute(u"hash"_s), manifest.RootHash());
    EXPECT_EQ(root.firstChildElement().tagName(), u"testmodules"_s);
    EXPECT_EQ(root.lastChildElement().tagName(), u"frameworks"_s);
    EXPECT_EQ(root.firstChildElement().childNodes().size(), 6);
    QByteArray output;
    if (testutil::HaveProgram(u"xmllint"_s))
        EXPECT_EQ(testutil::RunProgram(u"xmllint"_s, {u"--noout"_s, manifest.cacheFile}, &output), 0)
            << output.toStdString();
    ASSERT_EQ(testutil::RunProgram(u"" HARNESS_BINARY_DIR "/harness"_s,
                                   {u"manifest"_s, u"--kit"_s, kit->Root(), u"-o"_s, TempPath(u"tool"_s)}, &output),
              0)
        << output.toStdString();
    EXPECT_EQ(testutil::ReadFile(TempPath(u"tool/KVKManifest.xml"_s)), testutil::ReadFile(manifest.cacheFile));
}

TEST_F(ManifestCacheTest, EmptyCatalogueIsNeverWritten)
{
    kit->AddFrameworkPackage(u"testframeworks"_s, u"ctf"_s, u"Win32"_s, u"Debug"_s);
    Manifest manifest(kit->Root(), false);
    manifest.SetLogger(&logger);
    EXPECT_FALSE(manifest.GenerateManifest(false));
    EXPECT_FALSE(QFile::exists(manifest.cacheFile));
    EXPECT_TRUE(LogText().contains(u"WriteManifest has zero test cases to write"_s));
    EXPECT_FALSE(manifest.WriteManifest(TempPath(u"empty.xml"_s)));
    EXPECT_FALSE(QFile::exists(TempPath(u"empty.xml"_s)));
}

TEST_F(ManifestCacheTest, UnwritableDestinationAnswersFalseWithAMessage)
{
    kit->AddSourceModule(u"tests/a"_s, MakeModule(u"ctf"_s, u"A"_s));
    Manifest manifest = ScanKit();

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

TEST_F(ManifestCacheTest, WritingRecreatesAMissingCacheFolder)
{
    kit->AddSourceModule(u"tests/a"_s, MakeModule(u"ctf"_s, u"A"_s));
    Manifest manifest(kit->Root(), false);
    ASSERT_TRUE(QDir(manifest.cacheDirectory).removeRecursively());
    Scan(manifest);
    EXPECT_TRUE(QFile::exists(manifest.cacheFile));
}

class ManifestQueryTest : public ManifestCacheTest
{
protected:
    void SetUp() override
    {
        ManifestCacheTest::SetUp();
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
        return Names(out);
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
    // Each module is taken once, on the first pattern that fits; the family
    // filters do not apply to names.
    EXPECT_EQ(Select({u"*net"_s, u"net*"_s, u"audio"_s}, u"none"_s),
              (QStringList{"Audio", "EtherNet", "Net", "NetWork"}));
    EXPECT_EQ(Select({u"*"_s}).size(), 5);
    // The selection appends to what the list holds.
    QList<QSharedPointer<_TestModule>> out{manifest->FindTestModule(u"audio"_s)};
    EXPECT_EQ(manifest->GetTestModules(out, {u"net"_s}, QString(), QString()), 2u);
}

TEST_F(ManifestQueryTest, FamiliesAreMatchedByContainmentIgnoringCase)
{
    EXPECT_EQ(Select({}, u"Media"_s), (QStringList{"Audio", "NetWork", "SubNetTool"}));
    EXPECT_EQ(Select({}, u"media"_s, u"PLAY"_s), QStringList{"Audio"});
    EXPECT_EQ(Select({}), (QStringList{"Audio", "EtherNet", "Net", "NetWork", "SubNetTool"}));
    // A sub-family alone filters nothing.
    EXPECT_EQ(Select({}, QString(), u"Wired"_s).size(), 5);
}

TEST_F(ManifestQueryTest, FindIgnoresCaseAndFindsSecondaryModules)
{
    ASSERT_TRUE(manifest->FindTestModule(u"eTHERnET"_s));
    EXPECT_EQ(manifest->FindTestModule(u"ETHERNET"_s)->moduleName, u"EtherNet"_s);
    EXPECT_TRUE(manifest->FindTestModule(u"netlib"_s).dynamicCast<SecondaryModule>());
    EXPECT_FALSE(manifest->FindTestModule(u"ether"_s));
}

} // namespace
