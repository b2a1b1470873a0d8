#include "resources/kestoresources.h"

#include "bytes.h"
#include "common/xmlwriter.h"
#include "support/testutil.h"

#include <QDomDocument>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

using resourcebytes::Hex;
using resourcebytes::U16s;
using resourcebytes::U32s;

// A 40-byte module header announcing the given notification and MIME counts.
QByteArray MifHeaderBlock(quint16 notifications, quint16 mimeTypes)
{
    return U32s({0x11223344, 7}) + Hex("000102030405060708090A0B0C0D0E0F")
        + U16s({1, 2, 3, 4, notifications, mimeTypes, 9}) + QByteArray(2, '\0');
}

// An applet record; the second value is a handset address, never followed.
QByteArray AppletRecord(quint32 id, quint16 baseid)
{
    return U32s({id, 0xDEADBEEF}) + U16s({baseid, 2}) + U32s({0x01020304}) + U16s({5, 6});
}

QByteArray MimeRecord(quint32 value1, quint32 value2, const QByteArray &text)
{
    return U32s({value1, value2}) + text + '\0';
}

// A module-information file as the handset and the catalogue read it.
KestoResources ModuleInfo()
{
    KestoResources mif;
    mif.AddBinary(0x5000, 0, MifHeaderBlock(2, 2));
    mif.AddBinary(0x5000, 1, Hex("10000001 11000001 00000000 12000001"));
    mif.AddBinary(0x5000, 2, AppletRecord(0x01000010, 100) + AppletRecord(0x01000011, 200) + Hex("0102"));
    mif.AddBinary(0x5000, 3, Hex("20000001 FFFFFFFF 21000001"));
    mif.AddBinary(0x5000, 4, U32s({1, 2, 3, 4, 5, 6, 7, 8, 9}));
    mif.AddBinary(0x5000, 5, MimeRecord(1, 2, "text/plain") + MimeRecord(3, 4, "image/png"));
    return mif;
}

TEST(Mif, ReadsEveryRecordOfAModule)
{
    KestoResources mif = ModuleInfo();
    // Through the file format, as a handset reads an installed module.
    QByteArray file;
    ASSERT_TRUE(mif.SaveTo(file));
    KestoResources loaded;
    ASSERT_TRUE(loaded.LoadFrom(file));

    MifEntry entry;
    ASSERT_TRUE(loaded.GetMifEntry(entry));
    const MifHeader &h = entry.header;
    EXPECT_EQ(std::tie(h.value1, h.raw[15], h.count4, h.notificationCount, h.mimeTypeCount, h.count7),
              std::make_tuple(0x11223344u, quint8(0x0F), quint16(4), quint16(2), quint16(2), quint16(9)));
    EXPECT_EQ(entry.classes, (QVector<unsigned int>{0x01000010, 0x01000011}));
    EXPECT_EQ(entry.externalClasses, (QVector<unsigned int>{0x01000020}));

    ASSERT_EQ(entry.applets.size(), 2); // the 2-byte tail is dropped
    const Applet &a = entry.applets[1];
    EXPECT_TRUE(a.name.isEmpty());
    EXPECT_EQ(std::tie(a.appletid, a.nameRef, a.baseid, a.apptype, a.hostid, a.privset, a.flags),
              std::make_tuple(0x01000011u, 0xDEADBEEFu, quint16(200), quint16(2), 0x01020304u, quint16(5), quint16(6)));

    ASSERT_EQ(entry.notifications.size(), 2); // as announced, not as the block holds
    EXPECT_EQ(std::tie(entry.notifications[1].value1, entry.notifications[1].value3), std::make_tuple(4u, 6u));

    ASSERT_EQ(entry.mimeTypes.size(), 2);
    EXPECT_EQ(entry.mimeTypes[0].mimeType, u"text/plain"_s);
    EXPECT_EQ(entry.mimeTypes[1].value1, 3u);
    EXPECT_EQ(entry.mimeTypes[1].mimeType, u"image/png"_s);
}

// A class list ends at its zero value or with its block (a partial value is
// no class ID); records are read only as far as their block holds them.
TEST(Mif, RecordsAreReadOnlyInsideTheirBlock)
{
    KestoResources mif;
    mif.AddBinary(0x5000, 0, MifHeaderBlock(1000, 1000));
    mif.AddBinary(0x5000, 1, Hex("10000001 00000000 11000001"));
    mif.AddBinary(0x5000, 3, Hex("10000001 1100"));
    mif.AddBinary(0x5000, 4, Hex("010000000200000003000000 0400"));
    mif.AddBinary(0x5000, 5, MimeRecord(1, 2, "text/plain") + U32s({3, 4}) + "cut"); // no NUL before the end

    QVector<unsigned int> classes{42};
    ASSERT_TRUE(mif.GetMifClasses(classes));
    EXPECT_EQ(classes, (QVector<unsigned int>{0x01000010}));
    ASSERT_TRUE(mif.GetMifExternalClasses(classes));
    EXPECT_EQ(classes, (QVector<unsigned int>{0x01000010}));
    QVector<Notifier> notifications;
    ASSERT_TRUE(mif.GetMifNotifications(notifications));
    EXPECT_EQ(notifications.size(), 1);
    QVector<MimeType> types;
    ASSERT_TRUE(mif.GetMifMimeTypes(types));
    ASSERT_EQ(types.size(), 1);
    EXPECT_EQ(types[0].mimeType, u"text/plain"_s);

    mif.AddBinary(0x5000, 3, QByteArray());
    EXPECT_FALSE(mif.GetMifExternalClasses(classes));
    EXPECT_TRUE(classes.isEmpty());
}

TEST(Mif, HeaderShorterThan40BytesIsNoHeaderAndAnEntryWithoutOneIsLeftAlone)
{
    KestoResources mif = ModuleInfo();
    mif.AddBinary(0x5000, 0, MifHeaderBlock(2, 2).left(39));
    MifHeader header;
    header.value1 = 5;
    EXPECT_FALSE(mif.GetMifHeader(header));
    EXPECT_EQ(header.value1, 5u);
    // Without a header no notification or MIME type is announced.
    QVector<Notifier> notifications;
    EXPECT_TRUE(mif.GetMifNotifications(notifications));
    EXPECT_TRUE(notifications.isEmpty());

    mif.Clear(0x5000, 0);
    MifEntry entry;
    entry.classes = {7};
    EXPECT_FALSE(mif.GetMifEntry(entry));
    EXPECT_EQ(entry.classes, (QVector<unsigned int>{7}));

    // With a header, a list whose block is missing keeps its content.
    KestoResources partial;
    partial.AddBinary(0x5000, 0, MifHeaderBlock(0, 0));
    partial.AddBinary(0x5000, 1, Hex("10000001"));
    entry.applets = {Applet()};
    ASSERT_TRUE(partial.GetMifEntry(entry));
    EXPECT_EQ(entry.classes, (QVector<unsigned int>{0x01000010}));
    EXPECT_EQ(entry.applets.size(), 1);
}

QByteArray SysBlock(quint16 keysize, quint32 type, const QByteArray &key, std::initializer_list<quint32> values,
                    const QByteArray &tail = {})
{
    return U16s({keysize}) + U32s({type}) + key + U32s(values) + tail;
}

TEST(SysResource, DecodesEachKindOfRecordInsideItsBlock)
{
    const QByteArray blocks[] = {
        SysBlock(8, 0x0102FAF7, QByteArray("tests\0\0\0", 8), {1, 2, 3, 4, 5, 6, 7, 8, 0}),
        SysBlock(8, 0x0102C305, QByteArray("other\0\0\0", 8), {1, 2, 3, 4, 5, 6, 7, 8, 6}, QByteArray("-v x\0\0", 6)),
        SysBlock(4, 0x0103C6D9, Hex("2A000000"), {3, 5}, "prog!"),
        SysBlock(0, 0x01089D3C, {}, {1, 2, 3, 4, 5, 6, 7, 8, 9}),
        SysBlock(0, 0x0108AC1E, {}, {1, 2, 3, 2, 9, 1, 7, 10, 11, 20, 21, 30, 31}, QByteArray("a\0junk", 6)),
        SysBlock(0, 0x0108BFD2, {}, {12}), SysBlock(10, 0x01010100, "a::prog:x", {}),
        SysBlock(4, 0x01010100, "ab:c", {}), SysBlock(0, 0x010C02E5, {}, {1, 2, 3, 4}),
        // Override count of 4 billion, argument length of 4 GiB, key of 64 KiB, a cut keysize.
        SysBlock(0, 0x0108AC1E, {}, {1, 2, 3, 0xFFFFFFFF, 5, 0xFFFFFFFF, 7, 8, 9}),
        SysBlock(0xFFFF, 0x0102FAF7, "abc", {}), Hex("08")};
    KestoResources resources;
    for (quint16 id = 1; id <= std::size(blocks); ++id)
        resources.AddBinary(0x6000, id, blocks[id - 1]);

    // Each record's properties as "name=value", separated by "|"; a name alone: the record has no such property.
    const std::pair<quint16, const char *> expected[]
        = {{1, "Key=tests|main id=2|Privildedge Index=8|arg len=0|Arguments"},
           {2, "Key=other|Arguments=-v x|main id=2"},
           {3, "Key=42|Program Name=prog!"},
           {4, "transport id=2|Privildedge Index=9"},
           {5, "overrides=2|flags=7|override 1=11|override IIDs 0=20|override served 1=31|Arguments=a"},
           {6, "Privildedge Index=12"},
           {7, "Program Name=prog"},
           {8, "Key=1664770657|Program Name"}, // the four key bytes as a number
           {11, "Key=abc|version=0"}};
    SysResource record;
    for (const auto &[id, properties] : expected) {
        ASSERT_TRUE(resources.GetSysResource(id, record)) << id;
        for (const QString &property : QString::fromUtf8(properties).split(u'|')) {
            const QVariant value = record.Property(property.section(u'=', 0, 0).toUtf8().constData());
            if (property.contains(u'='))
                EXPECT_EQ(value.toString(), property.section(u'=', 1)) << id << " " << property.toStdString();
            else
                EXPECT_FALSE(value.isValid()) << id << " " << property.toStdString();
        }
    }

    ASSERT_TRUE(resources.GetSysResource(1, record));
    EXPECT_TRUE(record.IsProgram());
    EXPECT_EQ(std::make_tuple(record.keysize, record.type, record.PropertyNames().size()),
              std::make_tuple(quint16(8), 0x0102FAF7u, qsizetype(10)));
    ASSERT_TRUE(resources.GetSysResource(9, record));
    EXPECT_TRUE(record.PropertyNames().isEmpty());
    ASSERT_TRUE(resources.GetSysResource(10, record));
    EXPECT_LE(record.PropertyNames().size(), 16);
    ASSERT_TRUE(resources.GetSysResource(12, record));
    EXPECT_EQ(record.keysize, 0);

    ASSERT_TRUE(resources.GetSysResource(1, record));
    EXPECT_FALSE(resources.GetSysResource(13, record));
    EXPECT_EQ(record.type, 0u);
    EXPECT_TRUE(record.PropertyNames().isEmpty());
    EXPECT_FALSE(resources.GetSysResource(0x10001, record));
}

TEST(SysResource, XmlRoundTripKeepsTypeKeysizeAndPropertiesAndSkipsOddElements)
{
    KestoResources resources;
    resources.AddBinary(0x6000, 1,
                        SysBlock(8, 0x0102FAF7, QByteArray("tests\0\0\0", 8), {1, 2, 3, 4, 5, 6, 7, 8, 3}, "a b"));
    SysResource record;
    ASSERT_TRUE(resources.GetSysResource(1, record));

    QDomDocument document;
    QDomElement program = document.createElement(u"program"_s);
    document.appendChild(program);
    record.WriteToXML(program);
    EXPECT_EQ(program.attribute(u"type"_s), u"16972535"_s);
    EXPECT_EQ(program.attribute(u"keysize"_s), u"8"_s);
    EXPECT_FALSE(program.firstChildElement(u"data"_s).isNull());
    const QByteArray xml = XmlWriter::Serialize(document);
    EXPECT_TRUE(xml.contains("<property name=\"Privildedge Index\" value=\"8\"/>")) << xml.constData();
    EXPECT_TRUE(xml.contains("<property name=\"Key\" value=\"tests\"/>")) << xml.constData();

    QDomDocument reread;
    ASSERT_TRUE(reread.setContent(xml));
    SysResource back;
    back.data = "stale";
    back.ReadFromXML(reread.documentElement());
    EXPECT_EQ(back.type, 0x0102FAF7u);
    EXPECT_EQ(back.keysize, 8);
    EXPECT_TRUE(back.data.isEmpty());
    EXPECT_EQ(back.PropertyNames(), record.PropertyNames());
    for (const QByteArray &name : record.PropertyNames())
        EXPECT_EQ(back.Property(name.constData()).toString(), record.Property(name.constData()).toString())
            << name.constData();

    // An element without attributes reads as type and keysize 0, and no properties.
    back.ReadFromXML(document.createElement(u"program"_s));
    EXPECT_EQ(back.type, 0u);
    EXPECT_EQ(back.keysize, 0);

    QDomElement bare = document.createElement(u"program"_s);
    back.WriteToXML(bare);
    EXPECT_TRUE(bare.firstChildElement(u"properties"_s).isNull());
    EXPECT_TRUE(bare.firstChildElement(u"data"_s).isNull());

    back.SetProperty("empty", QByteArray());
    back.SetProperty("blank", QString());
    QDomElement emptyProps = document.createElement(u"program"_s);
    back.WriteToXML(emptyProps);
    const QDomElement properties = emptyProps.firstChildElement(u"properties"_s);
    ASSERT_FALSE(properties.isNull());
    EXPECT_FALSE(properties.hasChildNodes());

    // Keysize is kept to 16 bits; unnamed properties and unknown children are ignored.
    QDomDocument odd;
    ASSERT_TRUE(odd.setContent(QByteArray("<program type='12' keysize='65539'><other/><PROPERTIES>"
                                          "<x name='' value='1'/><y name='n' value='v'/></PROPERTIES></program>")));
    back.ReadFromXML(odd.documentElement());
    EXPECT_EQ(back.type, 12u);
    EXPECT_EQ(back.keysize, 3);
    EXPECT_EQ(back.PropertyNames(), (QList<QByteArray>{"n"}));
    EXPECT_EQ(back.Property("n").toByteArray(), QByteArray("v"));
}

TEST(SysResource, CopiesCarryTheirOwnProperties)
{
    SysResource record;
    record.data = "d";
    record.SetProperty("a", 1u);
    SysResource copy(record);
    copy.SetProperty("b", 2u);
    EXPECT_EQ(record.PropertyNames().size(), 1);
    QVector<SysResource> list{copy};
    record = list.first();
    list.clear();
    EXPECT_EQ(record.PropertyNames(), (QList<QByteArray>{"a", "b"}));
    EXPECT_EQ(record.Property("b").toUInt(), 2u);
    EXPECT_EQ(record.data, QByteArray("d"));
}

} // namespace
