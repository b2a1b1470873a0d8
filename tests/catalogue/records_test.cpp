#include "catalogue/compilervariant.h"
#include "catalogue/framework.h"
#include "catalogue/testcase.h"
#include "common/xmlwriter.h"
#include "support/mockdevice.h"

#include <QDomDocument>

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

QSharedPointer<_CompilerVariant> Variant(const QString &name, IKestoDevice::Platform arch = IKestoDevice::PLATFORM_ARM)
{
    QSharedPointer<_CompilerVariant> variant(new _CompilerVariant);
    variant->name = name;
    variant->arch = arch;
    return variant;
}

} // namespace

TEST(CompilerVariant, ReadsFilesListInAnyCaseAndSkipsEntriesWithoutPath)
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
}

TEST(CompilerVariant, WithoutNameIsRejectedButKeepsWhatWasRead)
{
    QDomDocument document;
    _CompilerVariant variant;
    variant.files << u"stale"_s;
    EXPECT_FALSE(variant.ReadFromXML(Parse(document, u"<v build='Release'/>"_s)));
    EXPECT_EQ(variant.build, u"Release"_s);
    EXPECT_TRUE(variant.files.isEmpty());
}

TEST(CompilerVariant, WritesEveryAttributeAndReadsBackTheSame)
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
    _CompilerVariant back;
    ASSERT_TRUE(back.ReadFromXML(element));
    EXPECT_EQ(back.name, variant.name);
    EXPECT_EQ(back.arch, variant.arch);
    EXPECT_EQ(back.files, variant.files);
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
    EXPECT_EQ(testCase.name, u"t1"_s);
    EXPECT_TRUE(testCase.type.isEmpty());
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

TEST(Framework, WritesClassIdInDecimalAndPaddedHex)
{
    _Framework framework;
    framework.name = u"oat"_s;
    framework.classId = 16;
    framework.variants.insert(u"z"_s, Variant(u"z"_s));
    framework.variants.insert(u"a"_s, Variant(u"a"_s, IKestoDevice::PLATFORM_WIN32));
    QDomDocument document;
    QDomElement element = RootElement(document, u"framework"_s);
    framework.WriteToManifest(element);
    const QDomElement id = element.lastChildElement(u"classid"_s);
    EXPECT_EQ(id.attribute(u"value"_s) + u' ' + id.attribute(u"valuehex"_s), u"16 0x00000010"_s);
    EXPECT_EQ(element.firstChildElement().attribute(u"name"_s), u"a"_s);

    _Framework back;
    ASSERT_TRUE(back.ReadFromManifest(element));
    EXPECT_EQ(back.classId, 16u);
    EXPECT_EQ(back.variants.size(), 2);
}

TEST(Framework, GetVariantTakesTheFirstByNameForThePlatform)
{
    _Framework framework;
    framework.variants.insert(u"b"_s, Variant(u"b"_s));
    framework.variants.insert(u"a"_s, Variant(u"a"_s));
    framework.variants.insert(u"0"_s, Variant(u"0"_s, IKestoDevice::PLATFORM_WIN32));
    EXPECT_EQ(framework.GetVariant(IKestoDevice::PLATFORM_ARM)->name, u"a"_s);
    EXPECT_TRUE(framework.GetVariant(IKestoDevice::PLATFORM_UNKNOWN).isNull());
}

TEST(Framework, IsLoadedAsksTheModuleThenTheClassDirectory)
{
    MockDevice device;
    _Framework framework;
    EXPECT_FALSE(framework.IsLoaded(&device)); // no class ID: never asks

    framework.classId = 0xabc;
    EXPECT_CALL(device, FindModule(0xabcu, _)).WillOnce(Return(0u)).WillRepeatedly(Return(1u));
    EXPECT_TRUE(framework.IsLoaded(&device));

    EXPECT_CALL(device, ListDirectory(u"fs:/~0x00000abc"_s, _))
        .WillOnce(ListingOf({u"fs:/~0x00000abc/a.mif"_s}))
        .WillOnce(ListingOf({}));
    EXPECT_TRUE(framework.IsLoaded(&device));
    EXPECT_FALSE(framework.IsLoaded(&device));
}

TEST(Framework, LoadHandsThePackagePathOverUnchangedEvenWhenEmpty)
{
    MockDevice device;
    device.platform = IKestoDevice::PLATFORM_ARM;
    QMap<QString, QString> env;
    _Framework framework;
    EXPECT_FALSE(framework.Load(&device, env));

    framework.variants.insert(u"a"_s, Variant(u"a"_s));
    EXPECT_CALL(device, InstallPackage(QString())).WillOnce(Return(0u)).WillOnce(Return(7u));
    EXPECT_TRUE(framework.Load(&device, env));
    EXPECT_FALSE(framework.Load(&device, env));
}

TEST(Framework, UnloadFallsBackToTheNamedDirectory)
{
    MockDevice device;
    QMap<QString, QString> env;
    _Framework framework;
    framework.name = u"ctf"_s;
    framework.classId = 5;
    EXPECT_CALL(device, FindModule(5u, _))
        .WillOnce(DoAll(SetArgReferee<1>(u"fs:/usermods/ctfx/"_s), Return(0u)))
        .WillOnce(Return(3u));
    EXPECT_CALL(device, RemoveDirectory(u"fs:/usermods/ctfx/"_s)).WillOnce(Return(0u));
    EXPECT_CALL(device, RemoveDirectory(u"fs:/usermods/ctf"_s)).WillOnce(Return(0u));
    framework.Unload(&device, env);
    framework.Unload(&device, env);
}
