// The catalogue's records: compiler variants, frameworks, test cases and the modules' own entries.

#include "catalogue/compilervariant.h"
#include "catalogue/framework.h"
#include "catalogue/testcase.h"
#include "catalogue/testmodule.h"
#include "common/stringhash.h"
#include "common/xmlwriter.h"
#include "support/mockdevice.h"
#include "support/testutil.h"

#include <QDomDocument>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

using ::testing::_;
using ::testing::DoAll;
using ::testing::Return;
using ::testing::SetArgReferee;

namespace {

QDomElement Parse(QDomDocument &document, const QString &xml)
{
    EXPECT_TRUE(document.setContent(xml)) << xml.toStdString();
    return document.documentElement();
}

// An element of that tag as the document's root.
QDomElement RootElement(QDomDocument &document, const QString &tag)
{
    return document.appendChild(document.createElement(tag)).toElement();
}

QSharedPointer<_CompilerVariant> Variant(const QString &name, IKestoDevice::Platform arch = IKestoDevice::PLATFORM_ARM,
                                         const QString &build = QString())
{
    QSharedPointer<_CompilerVariant> variant(new _CompilerVariant);
    variant->name = name;
    variant->arch = arch;
    variant->build = build;
    return variant;
}

TEST(CompilerVariant, ReadsFilesListInAnyCaseAndSkipsEntriesWithoutPathOrName)
{
    QDomDocument document;
    const QDomElement element = Parse(document,
                                      u"<variant name='w' variant='Win32' binpath='/b' arch='WIN32' build='Debug'>"
                                      "<FILES><File path='/b/a.dll'/><other/><x path='/b/c.dll'/></FILES>"
                                      "<files><File path='/b/d.dll'/></files></variant>"_s);
    _CompilerVariant variant;
    ASSERT_TRUE(variant.ReadFromXML(element));
    EXPECT_EQ(variant.files, QStringList({"/b/a.dll", "/b/c.dll", "/b/d.dll"}));
    EXPECT_EQ(variant.arch, IKestoDevice::PLATFORM_WIN32);
    EXPECT_EQ(variant.VariantPath(), u"/b"_s);
    variant.packagePath = u"/p.kestix"_s;
    EXPECT_EQ(variant.VariantPath(), u"/p.kestix"_s);

    // Without a name it is rejected, but keeps what was read.
    EXPECT_FALSE(variant.ReadFromXML(Parse(document, u"<v build='Release'/>"_s)));
    EXPECT_EQ(variant.build, u"Release"_s);
    EXPECT_TRUE(variant.files.isEmpty());
}

TEST(CompilerVariant, WritesEveryAttribute)
{
    _CompilerVariant variant;
    variant.name = u"m_RVCT22arm9_Release"_s;
    variant.arch = IKestoDevice::PLATFORM_ARM;
    variant.files << u"/x/1"_s << u"/x/2"_s;
    QDomDocument document;
    QDomElement element = RootElement(document, u"target"_s);
    variant.WriteToXML(element);
    EXPECT_EQ(XmlWriter::ToString(document, 0),
              u"<target arch=\"arm\" binpath=\"\" build=\"\" name=\"m_RVCT22arm9_Release\" "
              "packagepath=\"\" variant=\"\">\n<files>\n<File path=\"/x/1\"/>\n"
              "<File path=\"/x/2\"/>\n</files>\n</target>\n"_s);
}

TEST(CompilerVariant, ToListSortsByName)
{
    const QMap<QString, QSharedPointer<_CompilerVariant>> map{
        {u"1"_s, Variant(u"c"_s)}, {u"2"_s, Variant(u"a"_s)}, {u"3"_s, Variant(u"B"_s)}};
    QList<QSharedPointer<_CompilerVariant>> out{Variant(u"old"_s)};
    ASSERT_EQ(ToList(map, out), 3u);
    EXPECT_EQ((QStringList{out[0]->name, out[1]->name, out[2]->name}), (QStringList{"B", "a", "c"}));
}

TEST(TestCaseRecord, ReadsMissingAttributesAsEmpty)
{
    QDomDocument document;
    TestCase testCase(u"x"_s, u"y"_s);
    ASSERT_TRUE(testCase.ReadFromXML(Parse(document, u"<testcase name='t1'/>"_s)));
    EXPECT_EQ(testCase.name + u'|' + testCase.type, u"t1|"_s);
}

TEST(Framework, KeepsTheLastVariantOfANameAndReadsClassId)
{
    QDomDocument document;
    _Framework framework;
    ASSERT_TRUE(framework.ReadFromManifest(
        Parse(document,
              u"<framework name='ctf'><variant name='v' build='first'/><VARIANT name='v' build='second'/>"
              "<variant build='nameless'/><ClassId value='268435457'/></framework>"_s)));
    ASSERT_EQ(framework.variants.size(), 1);
    EXPECT_EQ(framework.variants.value(u"v"_s)->build, u"second"_s);
    EXPECT_EQ(framework.classId, 268435457u);

    _Framework bad;
    EXPECT_TRUE(bad.ReadFromManifest(Parse(document, u"<framework name='x'><classid value='0x10'/></framework>"_s)));
    EXPECT_EQ(bad.classId, 0u);
    EXPECT_FALSE(_Framework().ReadFromManifest(Parse(document, u"<framework/>"_s)));
}

TEST(Framework, WritesClassIdInDecimalAndPaddedHexAndGivesTheFirstVariantByNameForThePlatform)
{
    _Framework framework;
    framework.name = u"oat"_s;
    framework.classId = 16;
    framework.variants.insert(u"b"_s, Variant(u"b"_s));
    framework.variants.insert(u"a"_s, Variant(u"a"_s));
    framework.variants.insert(u"0"_s, Variant(u"0"_s, IKestoDevice::PLATFORM_WIN32));
    EXPECT_EQ(framework.GetVariant(IKestoDevice::PLATFORM_ARM)->name, u"a"_s);
    EXPECT_TRUE(framework.GetVariant(IKestoDevice::PLATFORM_UNKNOWN).isNull());
    QDomDocument document;
    QDomElement element = RootElement(document, u"framework"_s);
    framework.WriteToManifest(element);
    const QDomElement id = element.lastChildElement(u"classid"_s);
    EXPECT_EQ(id.attribute(u"value"_s) + u' ' + id.attribute(u"valuehex"_s), u"16 0x00000010"_s);
    EXPECT_EQ(element.firstChildElement().attribute(u"name"_s), u"0"_s);
}

// IsLoaded asks the module, then the class directory; Load hands the package path over unchanged, even when empty;
// Unload falls back to the directory named after the framework.
TEST(Framework, LoadsAndUnloadsThroughTheHandset)
{
    MockDevice device;
    device.platform = IKestoDevice::PLATFORM_ARM;
    QMap<QString, QString> env;
    _Framework framework;
    framework.name = u"ctf"_s;
    EXPECT_FALSE(framework.IsLoaded(&device)); // no class ID: never asks
    EXPECT_FALSE(framework.Load(&device, env)); // no variant

    framework.classId = 0xabc;
    EXPECT_CALL(device, FindModule(0xabcu, _))
        .WillOnce(Return(0u))
        .WillOnce(Return(1u))
        .WillOnce(Return(1u))
        .WillOnce(DoAll(SetArgReferee<1>(u"fs:/usermods/ctfx/"_s), Return(0u)))
        .WillOnce(Return(3u));
    EXPECT_CALL(device, ListDirectory(u"fs:/~0x00000abc"_s, _))
        .WillOnce(ListingOf({u"fs:/~0x00000abc/a.mif"_s}))
        .WillOnce(ListingOf({}));
    EXPECT_TRUE(framework.IsLoaded(&device));
    EXPECT_TRUE(framework.IsLoaded(&device));
    EXPECT_FALSE(framework.IsLoaded(&device));

    framework.variants.insert(u"a"_s, Variant(u"a"_s));
    EXPECT_CALL(device, InstallPackage(QString())).WillOnce(Return(0u)).WillOnce(Return(7u));
    EXPECT_TRUE(framework.Load(&device, env));
    EXPECT_FALSE(framework.Load(&device, env));

    EXPECT_CALL(device, RemoveDirectory(u"fs:/usermods/ctfx/"_s)).WillOnce(Return(0u));
    EXPECT_CALL(device, RemoveDirectory(u"fs:/usermods/ctf"_s)).WillOnce(Return(0u));
    framework.Unload(&device, env);
    framework.Unload(&device, env);
}

// The smallest concrete module: the catalogue side only.
class RecordModule : public _TestModule
{
public:
    QString TestType() override { return u"record"_s; }
    bool Run(IKestoDevice *, const QMap<QString, QString> &) override { return false; }
    bool GetLogFilePaths(IKestoDevice *, QStringList &) override { return false; }
    bool IsLogComplete(IKestoDevice *) override { return true; }
    using _TestModule::ParseLog;
    bool ParseLog(const QString &, TestResults &) override { return false; }
    void PostProcess(QMap<QString, QString> &) override { }
    QString ModuleName() override { return moduleName; }
    QString ModuleXMLName() override { return u"record.xml"_s; }
    bool ProcessModuleMIF(const QString &) override { return false; }

private:
    unsigned int KestoID() override { return 0; }
};

class ModuleXml : public ::testing::Test
{
protected:
    QString Write(const QByteArray &xml)
    {
        const QString path = dir.filePath(u"ctfmodule.xml"_s);
        testutil::WriteFile(path, xml);
        return path;
    }
    QTemporaryDir dir;
    RecordModule module;
};

TEST_F(ModuleXml, ReadsUpperCaseAttributesBeforeLowerCaseOnesAndOatModuleElements)
{
    ASSERT_TRUE(module.ProcessModuleXML(
        Write("<kit><SUITE NAME='Upper' name='lower' family='fam' SUBFAMILY='Sub' subfamily='sub'>"
              "<MinKestoVer>3.1</MinKestoVer><secondary_modules>helper</secondary_modules>"
              "<DDFUSAGE/><device_classids/>"
              "<TESTCASE NAME='a' TYPE='manual' type='auto'/>"
              "<testcase name='b'/>"
              "<testcase name='c' type=''/>"
              "<testcase type='auto'/>"
              "</SUITE></kit>")));
    EXPECT_EQ(module.moduleName, u"Upper"_s);
    EXPECT_EQ(module.family, u"fam"_s);
    EXPECT_EQ(module.subFamily, u"Sub"_s);
    EXPECT_EQ(module.minKestoVersion, u"3.1"_s);
    EXPECT_EQ(module.secondaryModules, QStringList{u"helper"_s});
    ASSERT_EQ(module.testCases.size(), 3);
    EXPECT_EQ(module.testCases[0].type, u"manual"_s);
    EXPECT_EQ(module.testCases[1].type, u"auto"_s);
    EXPECT_EQ(module.testCases[2].type, QString());
    EXPECT_TRUE(module.errorText.isEmpty());

    // An oat module element with lower-case names does too.
    RecordModule oat;
    ASSERT_TRUE(oat.ProcessModuleXML(Write("<x><oatmodule name='Timer' family='f' subfamily='s'/></x>")));
    EXPECT_EQ(oat.moduleName + u'/' + oat.subFamily, u"Timer/s"_s);
}

TEST_F(ModuleXml, FailsWithTheSuiteOrParseMessage)
{
    for (const QByteArray &xml : {QByteArray("<kit/>"), QByteArray("<kit><other/><suite name='x'/></kit>")}) {
        const QString path = Write(xml);
        EXPECT_FALSE(module.ProcessModuleXML(path));
        EXPECT_EQ(module.errorText, u"Error processing module xml file:"_s + path + u"\n\tSUITE node not found."_s);
    }
    // Parse errors give their line and column; a missing file no message.
    const QString path = Write("<kit>\n<suite name='x'>\n</kit>");
    EXPECT_FALSE(module.ProcessModuleXML(path));
    EXPECT_TRUE(module.errorText.startsWith(u"Error processing oat xml file:"_s + path + u"\n\t"_s));
    EXPECT_TRUE(module.errorText.contains(u": Line(3) Column("_s));
    EXPECT_FALSE(module.ProcessModuleXML(dir.filePath(u"missing.xml"_s)));
    EXPECT_TRUE(module.errorText.isEmpty());
}

TEST(TestModuleRecord, IdHashFollowsSourceNameFamilyAndSubFamily)
{
    RecordModule empty;
    QDomDocument document;
    QDomElement element = document.createElement(u"testmodule"_s);
    empty.WriteToManifest(element);
    EXPECT_EQ(empty.IDHash(), u"#0"_s);

    RecordModule kit, platform;
    for (RecordModule *module : {&kit, &platform}) {
        module->moduleName = u"ITimer"_s;
        module->family = u"Kernel"_s;
        module->subFamily = u"Time"_s;
    }
    kit.SetSource(u"KVK"_s);
    platform.SetSource(u"PVS"_s);
    kit.WriteToManifest(element);
    platform.WriteToManifest(element);
    EXPECT_EQ(kit.IDHash(), StringHashName(u"KVKITimerKernelTime"_s));
    EXPECT_NE(kit.IDHash(), platform.IDHash());
    EXPECT_EQ(element.attribute(u"idhash"_s), platform.IDHash());
}

TEST(TestModuleRecord, ManifestEntryRoundTrips)
{
    RecordModule module;
    module.moduleName = u"ITimer"_s;
    module.source = u"KVK"_s;
    Applet applet;
    applet.appletid = 0x1234;
    applet.baseid = 2000;
    applet.hostid = 9;
    applet.flags = 0x1f;
    module.applets << applet;
    module.secondaryModules << QString() << u"helper"_s;

    QDomDocument document;
    QDomElement element = RootElement(document, u"testmodule"_s);
    module.WriteToManifest(element);
    const QDomElement written = element.firstChildElement(u"applets"_s).firstChildElement();
    EXPECT_EQ(written.attribute(u"appletidhex"_s), u"0x00001234"_s);
    EXPECT_EQ(written.attribute(u"flagshex"_s), u"0x001f"_s);
    EXPECT_EQ(element.firstChildElement(u"secondary_modules"_s).childNodes().size(), 1);

    // Whole catalogues read back the same (manifest_test); here the fields a scanned kit leaves at their defaults.
    RecordModule back;
    ASSERT_TRUE(back.ReadFromManifest(element));
    EXPECT_EQ(back.IDHash(), module.IDHash());
    ASSERT_EQ(back.applets.size(), 1);
    EXPECT_EQ(u"%1 %2 %3"_s.arg(back.applets[0].baseid).arg(back.applets[0].hostid).arg(back.applets[0].flags),
              u"2000 9 31"_s);
}

TEST(TestModuleRecord, ManifestReadingDropsMalformedEntriesAndKeepsTheRest)
{
    QDomDocument document;
    ASSERT_TRUE(document.setContent(
        u"<testmodule source='KVK'>"
        "<targets><target name='a' arch='arm'/><target arch='arm'/><other name='b'/></targets>"
        "<applets><applet appletid='x'/><applet hostid='3'/><applet appletid='55' baseid='' flags='z'/></applets>"
        "<classids><classid value='0'/><classid value='nope'/><classid value='12'/></classids>"
        "<TestCases><testcase name='t'/><case name='u'/></TestCases>"
        "<secondary_modules><secondary_module name=''/><secondary_module/></secondary_modules>"
        "</testmodule>"_s));
    RecordModule module;
    EXPECT_FALSE(module.ReadFromManifest(document.documentElement()));
    EXPECT_EQ(module.targets.keys(), QStringList{u"a"_s});
    ASSERT_EQ(module.applets.size(), 1);
    EXPECT_EQ(u"%1 %2 %3"_s.arg(module.applets[0].appletid).arg(module.applets[0].baseid).arg(module.applets[0].flags),
              u"55 1000 0"_s);
    EXPECT_EQ(module.classids, QVector<unsigned int>{12u});
    EXPECT_EQ(module.testCases.size(), 1);
    EXPECT_TRUE(module.secondaryModules.isEmpty());
}

TEST(TestModuleRecord, GetCompilerVariantPrefersTheBuildAskedFor)
{
    RecordModule module;
    module.targets.insert(u"a"_s, Variant(u"a"_s, IKestoDevice::PLATFORM_ARM, u"Release"_s));
    EXPECT_EQ(module.GetCompilerVariant(IKestoDevice::PLATFORM_ARM, true)->name, u"a"_s);
    module.targets.insert(u"b"_s, Variant(u"b"_s, IKestoDevice::PLATFORM_ARM, u"Debug"_s));
    module.targets.insert(u"c"_s, Variant(u"c"_s, IKestoDevice::PLATFORM_ARM, u"other"_s));
    module.targets.insert(u"d"_s, Variant(u"d"_s, IKestoDevice::PLATFORM_WIN32, u"Debug"_s));
    EXPECT_EQ(module.GetCompilerVariant(IKestoDevice::PLATFORM_ARM, true)->name, u"b"_s);
    EXPECT_EQ(module.GetCompilerVariant(IKestoDevice::PLATFORM_ARM, false)->name, u"a"_s);
    EXPECT_EQ(module.GetCompilerVariant(IKestoDevice::PLATFORM_WIN32, false)->name, u"d"_s);
    EXPECT_TRUE(module.GetCompilerVariant(IKestoDevice::PLATFORM_UNKNOWN, false).isNull());
}

} // namespace
