#include "catalogue/compilervariant.h"
#include "catalogue/framework.h"
#include "catalogue/testcase.h"
#include "common/xmlwriter.h"
#include "support/mockdevice.h"

#include <QDomDocument>

#include <gtest/gtest.h>

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

QSharedPointer<_CompilerVariant> Variant(const QString &name, IKestoDevice::Platform arch,
                                         const QString &package = QString())
{
    QSharedPointer<_CompilerVariant> variant(new _CompilerVariant);
    variant->name = name;
    variant->arch = arch;
    variant->packagePath = package;
    return variant;
}

} // namespace

TEST(CompilerVariant, ReadsFilesListInAnyCaseAndSkipsEntriesWithoutPath)
{
    QDomDocument document;
    const QDomElement element = Parse(document, QStringLiteral(
        "<variant name='w' variant='Win32' binpath='/b' arch='WIN32' build='Debug'>"
        "<FILES><File path='/b/a.dll'/><other/><x path='/b/c.dll'/></FILES>"
        "<files><File path='/b/d.dll'/></files></variant>"));
    _CompilerVariant variant;
    ASSERT_TRUE(variant.ReadFromXML(element));
    EXPECT_EQ(variant.files, QStringList({"/b/a.dll", "/b/c.dll", "/b/d.dll"}));
    EXPECT_EQ(variant.arch, IKestoDevice::PLATFORM_WIN32);
    EXPECT_EQ(variant.VariantPath(), QStringLiteral("/b"));
    variant.packagePath = QStringLiteral("/p.kestix");
    EXPECT_EQ(variant.VariantPath(), QStringLiteral("/p.kestix"));
}

TEST(CompilerVariant, WithoutNameIsRejectedButKeepsWhatWasRead)
{
    QDomDocument document;
    _CompilerVariant variant;
    variant.files << QStringLiteral("stale");
    EXPECT_FALSE(variant.ReadFromXML(Parse(document, QStringLiteral("<v build='Release'/>"))));
    EXPECT_EQ(variant.build, QStringLiteral("Release"));
    EXPECT_TRUE(variant.files.isEmpty());
}

TEST(CompilerVariant, WritesEveryAttributeAndReadsBackTheSame)
{
    _CompilerVariant variant;
    variant.name = QStringLiteral("m_RVCT22arm9_Release");
    variant.arch = IKestoDevice::PLATFORM_ARM;
    variant.files << QStringLiteral("/x/1") << QStringLiteral("/x/2");
    QDomDocument document;
    QDomElement element = document.createElement(QStringLiteral("target"));
    document.appendChild(element);
    variant.WriteToXML(element);
    EXPECT_EQ(XmlWriter::ToString(document, 0),
              QStringLiteral("<target arch=\"arm\" binpath=\"\" build=\"\" name=\"m_RVCT22arm9_Release\" "
                             "packagepath=\"\" variant=\"\">\n<files>\n<File path=\"/x/1\"/>\n"
                             "<File path=\"/x/2\"/>\n</files>\n</target>\n"));
    _CompilerVariant back;
    ASSERT_TRUE(back.ReadFromXML(element));
    EXPECT_EQ(back.name, variant.name);
    EXPECT_EQ(back.arch, variant.arch);
    EXPECT_EQ(back.files, variant.files);
}

TEST(CompilerVariant, ToListSortsByName)
{
    QMap<QString, QSharedPointer<_CompilerVariant>> map;
    map.insert(QStringLiteral("1"), Variant(QStringLiteral("c"), IKestoDevice::PLATFORM_ARM));
    map.insert(QStringLiteral("2"), Variant(QStringLiteral("a"), IKestoDevice::PLATFORM_ARM));
    map.insert(QStringLiteral("3"), Variant(QStringLiteral("B"), IKestoDevice::PLATFORM_ARM));
    QList<QSharedPointer<_CompilerVariant>> out{Variant(QStringLiteral("old"), IKestoDevice::PLATFORM_ARM)};
    ASSERT_EQ(ToList(map, out), 3u);
    EXPECT_EQ(out[0]->name, QStringLiteral("B"));
    EXPECT_EQ(out[1]->name, QStringLiteral("a"));
    EXPECT_EQ(out[2]->name, QStringLiteral("c"));
}

TEST(TestCaseRecord, CopiesAndReadsMissingAttributesAsEmpty)
{
    QDomDocument document;
    TestCase testCase(QStringLiteral("x"), QStringLiteral("y"));
    ASSERT_TRUE(testCase.ReadFromXML(Parse(document, QStringLiteral("<testcase name='t1'/>"))));
    EXPECT_EQ(testCase.name, QStringLiteral("t1"));
    EXPECT_TRUE(testCase.type.isEmpty());
    TestCase copy(testCase);
    copy.type = QStringLiteral("auto");
    testCase = copy;
    EXPECT_EQ(testCase.type, QStringLiteral("auto"));
}

TEST(Framework, KeepsTheLastVariantOfANameAndReadsClassId)
{
    QDomDocument document;
    _Framework framework;
    ASSERT_TRUE(framework.ReadFromManifest(Parse(document, QStringLiteral(
        "<framework name='ctf'><variant name='v' build='first'/><VARIANT name='v' build='second'/>"
        "<variant build='nameless'/><ClassId value='268435457'/></framework>"))));
    ASSERT_EQ(framework.variants.size(), 1);
    EXPECT_EQ(framework.variants.value(QStringLiteral("v"))->build, QStringLiteral("second"));
    EXPECT_EQ(framework.classId, 268435457u);

    _Framework bad;
    EXPECT_TRUE(bad.ReadFromManifest(Parse(document, QStringLiteral(
        "<framework name='x'><classid value='0x10'/></framework>"))));
    EXPECT_EQ(bad.classId, 0u);
    EXPECT_FALSE(_Framework().ReadFromManifest(Parse(document, QStringLiteral("<framework/>"))));
}

TEST(Framework, WritesClassIdInDecimalAndPaddedHex)
{
    _Framework framework;
    framework.name = QStringLiteral("oat");
    framework.classId = 16;
    framework.variants.insert(QStringLiteral("z"), Variant(QStringLiteral("z"), IKestoDevice::PLATFORM_ARM));
    framework.variants.insert(QStringLiteral("a"), Variant(QStringLiteral("a"), IKestoDevice::PLATFORM_WIN32));
    QDomDocument document;
    QDomElement element = document.createElement(QStringLiteral("framework"));
    document.appendChild(element);
    framework.WriteToManifest(element);
    const QDomElement id = element.lastChildElement();
    EXPECT_EQ(id.tagName(), QStringLiteral("classid"));
    EXPECT_EQ(id.attribute(QStringLiteral("value")), QStringLiteral("16"));
    EXPECT_EQ(id.attribute(QStringLiteral("valuehex")), QStringLiteral("0x00000010"));
    EXPECT_EQ(element.firstChildElement().attribute(QStringLiteral("name")), QStringLiteral("a"));

    _Framework back;
    ASSERT_TRUE(back.ReadFromManifest(element));
    EXPECT_EQ(back.classId, 16u);
    EXPECT_EQ(back.variants.size(), 2);
}

TEST(Framework, GetVariantTakesTheFirstByNameForThePlatform)
{
    _Framework framework;
    framework.variants.insert(QStringLiteral("b"), Variant(QStringLiteral("b"), IKestoDevice::PLATFORM_ARM));
    framework.variants.insert(QStringLiteral("a"), Variant(QStringLiteral("a"), IKestoDevice::PLATFORM_ARM));
    framework.variants.insert(QStringLiteral("0"), Variant(QStringLiteral("0"), IKestoDevice::PLATFORM_WIN32));
    EXPECT_EQ(framework.GetVariant(IKestoDevice::PLATFORM_ARM)->name, QStringLiteral("a"));
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

    EXPECT_CALL(device, ListDirectory(QStringLiteral("fs:/~0x00000abc"), _))
        .WillOnce(ListingOf({QStringLiteral("fs:/~0x00000abc/a.mif")}))
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

    framework.variants.insert(QStringLiteral("a"), Variant(QStringLiteral("a"), IKestoDevice::PLATFORM_ARM));
    EXPECT_CALL(device, InstallPackage(QString())).WillOnce(Return(0u)).WillOnce(Return(7u));
    EXPECT_TRUE(framework.Load(&device, env));
    EXPECT_FALSE(framework.Load(&device, env));
}

TEST(Framework, UnloadFallsBackToTheNamedDirectory)
{
    MockDevice device;
    QMap<QString, QString> env;
    _Framework framework;
    framework.name = QStringLiteral("ctf");
    framework.classId = 5;
    EXPECT_CALL(device, FindModule(5u, _))
        .WillOnce(DoAll(SetArgReferee<1>(QStringLiteral("fs:/usermods/ctfx/")), Return(0u)))
        .WillOnce(Return(3u));
    EXPECT_CALL(device, RemoveDirectory(QStringLiteral("fs:/usermods/ctfx/"))).WillOnce(Return(0u));
    EXPECT_CALL(device, RemoveDirectory(QStringLiteral("fs:/usermods/ctf"))).WillOnce(Return(0u));
    framework.Unload(&device, env);
    framework.Unload(&device, env);
}
