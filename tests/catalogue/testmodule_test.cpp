#include "catalogue/testmodule.h"
#include "common/stringhash.h"
#include "support/testutil.h"

#include <QDomDocument>
#include <QProcess>
#include <QTemporaryDir>

#include <gtest/gtest.h>

namespace {

// The smallest concrete module: the catalogue side only.
class RecordModule : public _TestModule
{
public:
    QString TestType() override { return QStringLiteral("record"); }
    bool Run(IKestoDevice *, const QMap<QString, QString> &) override { return false; }
    bool GetLogFilePaths(IKestoDevice *, QStringList &) override { return false; }
    bool IsLogComplete(IKestoDevice *) override { return true; }
    using _TestModule::ParseLog;
    bool ParseLog(const QString &, TestResults &) override { return false; }
    void PostProcess(QMap<QString, QString> &) override {}
    QString ModuleName() override { return moduleName; }
    QString ModuleXMLName() override { return QStringLiteral("record.xml"); }
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
        const QString path = dir.filePath(QStringLiteral("ctfmodule.xml"));
        testutil::WriteFile(path, xml);
        return path;
    }
    QTemporaryDir dir;
    RecordModule module;
};

} // namespace

TEST_F(ModuleXml, ReadsUpperCaseAttributesBeforeLowerCaseOnes)
{
    ASSERT_TRUE(module.ProcessModuleXML(Write(
        "<kit><SUITE NAME='Upper' name='lower' family='fam' SUBFAMILY='Sub' subfamily='sub'>"
        "<MinKestoVer>3.1</MinKestoVer><secondary_modules>helper</secondary_modules>"
        "<DDFUSAGE/><device_classids/>"
        "<TESTCASE NAME='a' TYPE='manual' type='auto'/>"
        "<testcase name='b'/>"
        "<testcase name='c' type=''/>"
        "<testcase type='auto'/>"
        "</SUITE></kit>")));
    EXPECT_EQ(module.moduleName, QStringLiteral("Upper"));
    EXPECT_EQ(module.family, QStringLiteral("fam"));
    EXPECT_EQ(module.subFamily, QStringLiteral("Sub"));
    EXPECT_EQ(module.minKestoVersion, QStringLiteral("3.1"));
    EXPECT_EQ(module.secondaryModules, QStringList{QStringLiteral("helper")});
    ASSERT_EQ(module.testCases.size(), 3);
    EXPECT_EQ(module.testCases[0].type, QStringLiteral("manual"));
    EXPECT_EQ(module.testCases[1].type, QStringLiteral("auto"));
    EXPECT_EQ(module.testCases[2].type, QString());
    EXPECT_TRUE(module.errorText.isEmpty());
}

TEST_F(ModuleXml, AcceptsAnOatModuleElementWithLowerCaseNames)
{
    ASSERT_TRUE(module.ProcessModuleXML(Write("<x><oatmodule name='Timer' family='f' subfamily='s'/></x>")));
    EXPECT_EQ(module.moduleName, QStringLiteral("Timer"));
    EXPECT_EQ(module.subFamily, QStringLiteral("s"));
}

TEST_F(ModuleXml, FailsWithTheSuiteMessageWhenTheFirstElementIsNoSuite)
{
    for (const QByteArray &xml : {QByteArray("<kit/>"), QByteArray("<kit><other/><suite name='x'/></kit>")}) {
        const QString path = Write(xml);
        EXPECT_FALSE(module.ProcessModuleXML(path));
        EXPECT_EQ(module.errorText, QStringLiteral("Error processing module xml file:") + path
                                        + QStringLiteral("\n\tSUITE node not found."));
    }
}

TEST_F(ModuleXml, ReportsParseErrorsWithLineAndColumn)
{
    const QString path = Write("<kit>\n<suite name='x'>\n</kit>");
    EXPECT_FALSE(module.ProcessModuleXML(path));
    EXPECT_TRUE(module.errorText.startsWith(QStringLiteral("Error processing oat xml file:") + path
                                            + QStringLiteral("\n\t")));
    EXPECT_TRUE(module.errorText.contains(QStringLiteral(": Line(3) Column(")));
    EXPECT_FALSE(module.ProcessModuleXML(dir.filePath(QStringLiteral("missing.xml"))));
    EXPECT_TRUE(module.errorText.isEmpty());
}

TEST(TestModuleRecord, IdHashFollowsSourceNameFamilyAndSubFamily)
{
    RecordModule empty;
    QDomDocument document;
    QDomElement element = document.createElement(QStringLiteral("testmodule"));
    empty.WriteToManifest(element);
    EXPECT_EQ(empty.IDHash(), QStringLiteral("#0"));

    RecordModule kit;
    RecordModule platform;
    for (RecordModule *module : {&kit, &platform}) {
        module->moduleName = QStringLiteral("ITimer");
        module->family = QStringLiteral("Kernel");
        module->subFamily = QStringLiteral("Time");
    }
    kit.SetSource(QStringLiteral("KVK"));
    platform.SetSource(QStringLiteral("PVS"));
    kit.WriteToManifest(element);
    platform.WriteToManifest(element);
    EXPECT_EQ(kit.IDHash(), StringHashName(QStringLiteral("KVKITimerKernelTime")));
    EXPECT_NE(kit.IDHash(), platform.IDHash());
    EXPECT_EQ(element.attribute(QStringLiteral("idhash")), platform.IDHash());
}

TEST(TestModuleRecord, ManifestEntryRoundTrips)
{
    RecordModule module;
    module.moduleName = QStringLiteral("ITimer");
    module.source = QStringLiteral("KVK");
    module.classids << 0x10000001u << 7u;
    Applet applet;
    applet.appletid = 0x1234;
    applet.baseid = 2000;
    applet.hostid = 9;
    applet.flags = 0x1f;
    module.applets << applet;
    module.testCases << TestCase(QStringLiteral("t1"), QStringLiteral("auto"));
    module.targets.insert(QStringLiteral("ITimer_Win32_Debug"),
                          Target(QStringLiteral("ITimer_Win32_Debug"), IKestoDevice::PLATFORM_WIN32, QStringLiteral("Debug")));
    module.secondaryModules << QString() << QStringLiteral("helper");

    QDomDocument document;
    QDomElement element = document.createElement(QStringLiteral("testmodule"));
    document.appendChild(element);
    module.WriteToManifest(element);
    EXPECT_EQ(element.attribute(QStringLiteral("testtype")), QStringLiteral("record"));
    const QDomElement written = element.firstChildElement(QStringLiteral("applets")).firstChildElement();
    EXPECT_EQ(written.attribute(QStringLiteral("appletidhex")), QStringLiteral("0x00001234"));
    EXPECT_EQ(written.attribute(QStringLiteral("flagshex")), QStringLiteral("0x001f"));
    EXPECT_EQ(element.firstChildElement(QStringLiteral("secondary_modules")).childNodes().size(), 1);

    // The file a manifest would hold is well-formed XML to an outside reader.
    if (testutil::HaveProgram(QStringLiteral("xmllint"))) {
        QTemporaryDir dir;
        const QString path = dir.filePath(QStringLiteral("m.xml"));
        testutil::WriteFile(path, document.toByteArray());
        EXPECT_EQ(testutil::RunProgram(QStringLiteral("xmllint"), {QStringLiteral("--noout"), path}), 0);
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
    EXPECT_EQ(back.secondaryModules, QStringList{QStringLiteral("helper")});
}

TEST(TestModuleRecord, ManifestReadingDropsMalformedEntriesAndKeepsTheRest)
{
    QDomDocument document;
    ASSERT_TRUE(document.setContent(QStringLiteral(
        "<testmodule source='KVK'>"
        "<targets><target name='a' arch='arm'/><target arch='arm'/><other name='b'/></targets>"
        "<applets><applet appletid='x'/><applet hostid='3'/><applet appletid='55' baseid='' flags='z'/></applets>"
        "<classids><classid value='0'/><classid value='nope'/><classid value='12'/></classids>"
        "<TestCases><testcase name='t'/><case name='u'/></TestCases>"
        "<secondary_modules><secondary_module name=''/><secondary_module/></secondary_modules>"
        "</testmodule>")));
    RecordModule module;
    EXPECT_FALSE(module.ReadFromManifest(document.documentElement()));
    EXPECT_EQ(module.targets.keys(), QStringList{QStringLiteral("a")});
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
    module.targets.insert(QStringLiteral("a"), Target(QStringLiteral("a"), IKestoDevice::PLATFORM_ARM, QStringLiteral("Release")));
    EXPECT_EQ(module.GetCompilerVariant(IKestoDevice::PLATFORM_ARM, true)->name, QStringLiteral("a"));
    module.targets.insert(QStringLiteral("b"), Target(QStringLiteral("b"), IKestoDevice::PLATFORM_ARM, QStringLiteral("Debug")));
    module.targets.insert(QStringLiteral("c"), Target(QStringLiteral("c"), IKestoDevice::PLATFORM_ARM, QStringLiteral("other")));
    module.targets.insert(QStringLiteral("d"), Target(QStringLiteral("d"), IKestoDevice::PLATFORM_WIN32, QStringLiteral("Debug")));
    EXPECT_EQ(module.GetCompilerVariant(IKestoDevice::PLATFORM_ARM, true)->name, QStringLiteral("b"));
    EXPECT_EQ(module.GetCompilerVariant(IKestoDevice::PLATFORM_ARM, false)->name, QStringLiteral("a"));
    EXPECT_EQ(module.GetCompilerVariant(IKestoDevice::PLATFORM_WIN32, false)->name, QStringLiteral("d"));
    EXPECT_TRUE(module.GetCompilerVariant(IKestoDevice::PLATFORM_UNKNOWN, false).isNull());
}
