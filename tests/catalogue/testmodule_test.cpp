#include "catalogue/testmodule.h"
#include "common/stringhash.h"
#include "support/testutil.h"

#include <QDomDocument>
#include <QProcess>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

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

QSharedPointer<_CompilerVariant> Target(const QString &name, IKestoDevice::Platform arch, const QString &build)
{
    QSharedPointer<_CompilerVariant> variant(new _CompilerVariant);
    variant->name = name;
    variant->arch = arch;
    variant->build = build;
    return variant;
}

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

} // namespace

TEST_F(ModuleXml, ReadsUpperCaseAttributesBeforeLowerCaseOnes)
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
}

TEST_F(ModuleXml, AcceptsAnOatModuleElementWithLowerCaseNames)
{
    ASSERT_TRUE(module.ProcessModuleXML(Write("<x><oatmodule name='Timer' family='f' subfamily='s'/></x>")));
    EXPECT_EQ(module.moduleName, u"Timer"_s);
    EXPECT_EQ(module.subFamily, u"s"_s);
}

TEST_F(ModuleXml, FailsWithTheSuiteMessageWhenTheFirstElementIsNoSuite)
{
    for (const QByteArray &xml : {QByteArray("<kit/>"), QByteArray("<kit><other/><suite name='x'/></kit>")}) {
        const QString path = Write(xml);
        EXPECT_FALSE(module.ProcessModuleXML(path));
        EXPECT_EQ(module.errorText, u"Error processing module xml file:"_s + path + u"\n\tSUITE node not found."_s);
    }
}

TEST_F(ModuleXml, ReportsParseErrorsWithLineAndColumn)
{
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

    RecordModule kit;
    RecordModule platform;
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
    module.classids << 0x10000001u << 7u;
    Applet applet;
    applet.appletid = 0x1234;
    applet.baseid = 2000;
    applet.hostid = 9;
    applet.flags = 0x1f;
    module.applets << applet;
    module.testCases << TestCase(u"t1"_s, u"auto"_s);
    module.targets.insert(u"ITimer_Win32_Debug"_s,
                          Target(u"ITimer_Win32_Debug"_s, IKestoDevice::PLATFORM_WIN32, u"Debug"_s));
    module.secondaryModules << QString() << u"helper"_s;

    QDomDocument document;
    QDomElement element = document.createElement(u"testmodule"_s);
    document.appendChild(element);
    module.WriteToManifest(element);
    EXPECT_EQ(element.attribute(u"testtype"_s), u"record"_s);
    const QDomElement written = element.firstChildElement(u"applets"_s).firstChildElement();
    EXPECT_EQ(written.attribute(u"appletidhex"_s), u"0x00001234"_s);
    EXPECT_EQ(written.attribute(u"flagshex"_s), u"0x001f"_s);
    EXPECT_EQ(element.firstChildElement(u"secondary_modules"_s).childNodes().size(), 1);

    // The file a manifest would hold is well-formed XML to an outside reader.
    if (testutil::HaveProgram(u"xmllint"_s)) {
        QTemporaryDir dir;
        const QString path = dir.filePath(u"m.xml"_s);
        testutil::WriteFile(path, document.toByteArray());
        EXPECT_EQ(testutil::RunProgram(u"xmllint"_s, {u"--noout"_s, path}), 0);
    }

    RecordModule back;
    ASSERT_TRUE(back.ReadFromManifest(element));
    EXPECT_EQ(back.moduleName, module.moduleName);
    EXPECT_EQ(back.IDHash(), module.IDHash());
    EXPECT_EQ(back.classids, module.classids);
    ASSERT_EQ(back.applets.size(), 1);
    EXPECT_EQ(back.applets[0].appletid, 0x1234u);
    EXPECT_EQ(back.applets[0].baseid, 2000);
    EXPECT_EQ(back.applets[0].flags, 0x1f);
    EXPECT_TRUE(back.applets[0].name.isEmpty());
    EXPECT_EQ(back.testCases.size(), 1);
    EXPECT_EQ(back.targets.size(), 1);
    EXPECT_EQ(back.secondaryModules, QStringList{u"helper"_s});
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
    EXPECT_EQ(module.applets[0].appletid, 55u);
    EXPECT_EQ(module.applets[0].baseid, 1000);
    EXPECT_EQ(module.applets[0].flags, 0);
    EXPECT_EQ(module.classids, QVector<unsigned int>{12u});
    EXPECT_EQ(module.testCases.size(), 1);
    EXPECT_TRUE(module.secondaryModules.isEmpty());
}

TEST(TestModuleRecord, GetCompilerVariantPrefersTheBuildAskedFor)
{
    RecordModule module;
    module.targets.insert(u"a"_s, Target(u"a"_s, IKestoDevice::PLATFORM_ARM, u"Release"_s));
    EXPECT_EQ(module.GetCompilerVariant(IKestoDevice::PLATFORM_ARM, true)->name, u"a"_s);
    module.targets.insert(u"b"_s, Target(u"b"_s, IKestoDevice::PLATFORM_ARM, u"Debug"_s));
    module.targets.insert(u"c"_s, Target(u"c"_s, IKestoDevice::PLATFORM_ARM, u"other"_s));
    module.targets.insert(u"d"_s, Target(u"d"_s, IKestoDevice::PLATFORM_WIN32, u"Debug"_s));
    EXPECT_EQ(module.GetCompilerVariant(IKestoDevice::PLATFORM_ARM, true)->name, u"b"_s);
    EXPECT_EQ(module.GetCompilerVariant(IKestoDevice::PLATFORM_ARM, false)->name, u"a"_s);
    EXPECT_EQ(module.GetCompilerVariant(IKestoDevice::PLATFORM_WIN32, false)->name, u"d"_s);
    EXPECT_TRUE(module.GetCompilerVariant(IKestoDevice::PLATFORM_UNKNOWN, false).isNull());
}
