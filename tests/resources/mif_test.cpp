#include "resources/kestoresources.h"

#include "bytes.h"
#include "common/xmlwriter.h"
#include "support/testutil.h"

#include <QDomDocument>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

using resourcebytes::Hex;
using resourcebytes::U16;
using resourcebytes::U32;

// A 40-byte module header announcing the given notification and MIME counts.
QByteArray MifHeaderBlock(quint16 notifications, quint16 mimeTypes)
{
    QByteArray block;
    U32(block, 0x11223344);
    U32(block, 7);
    block.append(Hex("000102030405060708090A0B0C0D0E0F"));
    for (quint16 value : {quint16(1), quint16(2), quint16(3), quint16(4), notifications, mimeTypes, quint16(9)})
        U16(block, value);
    block.append(2, '\0');
    return block;
}

QByteArray AppletRecord(quint32 id, quint16 baseid)
{
    QByteArray record;
    U32(record, id);
    U32(record, 0xDEADBEEF); // a handset address, never followed
    U16(record, baseid);
    U16(record, 2);
    U32(record, 0x01020304);
    U16(record, 5);
    U16(record, 6);
    return record;
}

// A module-information file as the handset and the catalogue read it.
KestoResources ModuleInfo()
{
    KestoResources mif;
    mif.AddBinary(0x5000, 0, MifHeaderBlock(2, 2));
    mif.AddBinary(0x5000, 1, Hex("10000001 11000001 00000000 12000001"));
    mif.AddBinary(0x5000, 2, AppletRecord(0x01000010, 100) + AppletRecord(0x01000011, 200) + Hex("0102"));
    mif.AddBinary(0x5000, 3, Hex("20000001 FFFFFFFF 21000001"));
    QByteArray notifications;
    for (quint32 v = 1; v <= 9; ++v)
        U32(notifications, v);
    mif.AddBinary(0x5000, 4, notifications);
    QByteArray mimeTypes;
    U32(mimeTypes, 1);
    U32(mimeTypes, 2);
    mimeTypes.append("text/plain", 11);
    U32(mimeTypes, 3);
    U32(mimeTypes, 4);
    mimeTypes.append("image/png", 10);
    mif.AddBinary(0x5000, 5, mimeTypes);
    return mif;
}

TEST(Mif, ClassListEndsAtItsZeroValue)
{
    KestoResources mif;
    mif.AddBinary(0x5000, 1, Hex("10000001 00000000 11000001"));
    QVector<unsigned int> classes{42};
    ASSERT_TRUE(mif.GetMifClasses(classes));
    EXPECT_EQ(classes, (QVector<unsigned int>{0x01000010}));

    // The end of the block ends it too; a partial value is no class ID.
    mif.AddBinary(0x5000, 3, Hex("10000001 1100"));
    ASSERT_TRUE(mif.GetMifExternalClasses(classes));
    EXPECT_EQ(classes, (QVector<unsigned int>{0x01000010}));
    mif.AddBinary(0x5000, 3, QByteArray());
    EXPECT_FALSE(mif.GetMifExternalClasses(classes));
    EXPECT_TRUE(classes.isEmpty());
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
    EXPECT_EQ(entry.header.value1, 0x11223344u);
    EXPECT_EQ(entry.header.raw[15], 0x0F);
    EXPECT_EQ(entry.header.count4, 4);
    EXPECT_EQ(entry.header.notificationCount, 2);
    EXPECT_EQ(entry.header.mimeTypeCount, 2);
    EXPECT_EQ(entry.header.count7, 9);
    EXPECT_EQ(entry.classes, (QVector<unsigned int>{0x01000010, 0x01000011}));
    EXPECT_EQ(entry.externalClasses, (QVector<unsigned int>{0x01000020}));

    ASSERT_EQ(entry.applets.size(), 2); // the 2-byte tail is dropped
    EXPECT_EQ(entry.applets[1].appletid, 0x01000011u);
    EXPECT_TRUE(entry.applets[1].name.isEmpty());
    EXPECT_EQ(entry.applets[1].nameRef, 0xDEADBEEFu);
    EXPECT_EQ(entry.applets[1].baseid, 200);
    EXPECT_EQ(entry.applets[1].apptype, 2);
    EXPECT_EQ(entry.applets[1].hostid, 0x01020304u);
    EXPECT_EQ(entry.applets[1].privset, 5);
    EXPECT_EQ(entry.applets[1].flags, 6);

    ASSERT_EQ(entry.notifications.size(), 2); // as announced, not as the block holds
    EXPECT_EQ(entry.notifications[1].value1, 4u);
    EXPECT_EQ(entry.notifications[1].value3, 6u);

    ASSERT_EQ(entry.mimeTypes.size(), 2);
    EXPECT_EQ(entry.mimeTypes[0].mimeType, u"text/plain"_s);
    EXPECT_EQ(entry.mimeTypes[1].value1, 3u);
    EXPECT_EQ(entry.mimeTypes[1].mimeType, u"image/png"_s);
}

TEST(Mif, RecordsAreReadOnlyInsideTheirBlock)
{
    KestoResources mif;
    mif.AddBinary(0x5000, 0, MifHeaderBlock(1000, 1000));
    mif.AddBinary(0x5000, 4, Hex("010000000200000003000000 0400"));
    QByteArray mimeTypes;
    U32(mimeTypes, 1);
    U32(mimeTypes, 2);
    mimeTypes.append("text/plain", 11);
    U32(mimeTypes, 3);
    U32(mimeTypes, 4);
    mimeTypes.append("cut"); // no NUL before the end
    mif.AddBinary(0x5000, 5, mimeTypes);

    QVector<Notifier> notifications;
    ASSERT_TRUE(mif.GetMifNotifications(notifications));
    EXPECT_EQ(notifications.size(), 1);
    QVector<MimeType> types;
    ASSERT_TRUE(mif.GetMifMimeTypes(types));
    ASSERT_EQ(types.size(), 1);
    EXPECT_EQ(types[0].mimeType, u"text/plain"_s);
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

QByteArray SysBlock(quint16 keysize, quint32 type, const QByteArray &key, const QVector<quint32> &values,
                    const QByteArray &tail = QByteArray())
{
    QByteArray block;
    U16(block, keysize);
    U32(block, type);
    block.append(key);
    for (quint32 value : values)
        U32(block, value);
    return block + tail;
}

TEST(SysResource, ProgramRecordWithAnEightByteKey)
{
    KestoResources resources;
    resources.AddBinary(0x6000, 1, SysBlock(8, 0x0102FAF7, QByteArray("tests\0\0\0", 8), {1, 2, 3, 4, 5, 6, 7, 8, 0}));
    resources.AddBinary(
        0x6000, 2,
        SysBlock(8, 0x0102C305, QByteArray("other\0\0\0", 8), {1, 2, 3, 4, 5, 6, 7, 8, 6}, QByteArray("-v x\0\0", 6)));
    SysResource record;
    ASSERT_TRUE(resources.GetSysResource(1, record));
    EXPECT_TRUE(record.IsProgram());
    EXPECT_EQ(record.keysize, 8);
    EXPECT_EQ(record.type, 0x0102FAF7u);
    EXPECT_EQ(record.Property("Key").toByteArray(), QByteArray("tests"));
    EXPECT_EQ(record.Property("main id").toUInt(), 2u);
    EXPECT_EQ(record.Property("Privildedge Index").toUInt(), 8u);
    EXPECT_EQ(record.Property("arg len").toUInt(), 0u);
    EXPECT_FALSE(record.Property("Arguments").isValid());
    EXPECT_EQ(record.PropertyNames().size(), 10);

    ASSERT_TRUE(resources.GetSysResource(2, record));
    EXPECT_EQ(record.Property("Key").toByteArray(), QByteArray("other"));
    EXPECT_EQ(record.Property("Arguments").toByteArray(), QByteArray("-v x"));
    EXPECT_EQ(record.Property("main id").toUInt(), 2u);

    EXPECT_FALSE(resources.GetSysResource(3, record));
    EXPECT_EQ(record.type, 0u);
    EXPECT_TRUE(record.PropertyNames().isEmpty());
    EXPECT_FALSE(resources.GetSysResource(0x10001, record));
}

TEST(SysResource, DecodesEachKindOfRecord)
{
    KestoResources resources;
    resources.AddBinary(0x6000, 1, SysBlock(4, 0x0103C6D9, Hex("2A000000"), {3, 5}, "prog!"));
    resources.AddBinary(0x6000, 2, SysBlock(0, 0x01089D3C, {}, {1, 2, 3, 4, 5, 6, 7, 8, 9}));
    resources.AddBinary(
        0x6000, 3,
        SysBlock(0, 0x0108AC1E, {}, {1, 2, 3, 2, 9, 3, 7, 10, 11, 20, 21, 30, 31}, QByteArray("ab\0junk", 7)));
    resources.AddBinary(0x6000, 4, SysBlock(0, 0x0108BFD2, {}, {12}));
    resources.AddBinary(0x6000, 5, SysBlock(10, 0x01010100, "a::prog:x", {}));
    resources.AddBinary(0x6000, 6, SysBlock(4, 0x01010100, "ab:c", {}));
    resources.AddBinary(0x6000, 7, SysBlock(0, 0x010C02E5, {}, {1, 2, 3, 4}));

    SysResource record;
    ASSERT_TRUE(resources.GetSysResource(1, record));
    EXPECT_EQ(record.Property("Key").toUInt(), 42u);
    EXPECT_EQ(record.Property("Program Name").toByteArray(), QByteArray("prog!"));

    ASSERT_TRUE(resources.GetSysResource(2, record));
    EXPECT_EQ(record.Property("transport id").toUInt(), 2u);
    EXPECT_EQ(record.Property("Privildedge Index").toUInt(), 9u);

    ASSERT_TRUE(resources.GetSysResource(3, record));
    EXPECT_EQ(record.Property("overrides").toUInt(), 2u);
    EXPECT_EQ(record.Property("flags").toUInt(), 7u);
    EXPECT_EQ(record.Property("override 1").toUInt(), 11u);
    EXPECT_EQ(record.Property("override IIDs 0").toUInt(), 20u);
    EXPECT_EQ(record.Property("override served 1").toUInt(), 31u);
    EXPECT_EQ(record.Property("Arguments").toByteArray(), QByteArray("ab"));

    ASSERT_TRUE(resources.GetSysResource(4, record));
    EXPECT_EQ(record.Property("Privildedge Index").toUInt(), 12u);

    ASSERT_TRUE(resources.GetSysResource(5, record));
    EXPECT_EQ(record.Property("Program Name").toString(), u"prog"_s);
    ASSERT_TRUE(resources.GetSysResource(6, record));
    EXPECT_EQ(record.Property("Key").toUInt(), 0x633A6261u);
    EXPECT_FALSE(record.Property("Program Name").isValid());

    ASSERT_TRUE(resources.GetSysResource(7, record));
    EXPECT_TRUE(record.PropertyNames().isEmpty());
}

TEST(SysResource, TruncatedAndOversizedRecordsStayInsideTheBlock)
{
    KestoResources resources;
    // Override count of 4 billion, argument length of 4 GiB, key of 64 KiB.
    resources.AddBinary(0x6000, 1, SysBlock(0, 0x0108AC1E, {}, {1, 2, 3, 0xFFFFFFFF, 5, 0xFFFFFFFF, 7, 8, 9}));
    resources.AddBinary(0x6000, 2, SysBlock(0xFFFF, 0x0102FAF7, "abc", {}));
    resources.AddBinary(0x6000, 3, Hex("08"));
    SysResource record;
    ASSERT_TRUE(resources.GetSysResource(1, record));
    EXPECT_LE(record.PropertyNames().size(), 16);
    ASSERT_TRUE(resources.GetSysResource(2, record));
    EXPECT_EQ(record.Property("Key").toByteArray(), QByteArray("abc"));
    EXPECT_EQ(record.Property("version").toUInt(), 0u);
    ASSERT_TRUE(resources.GetSysResource(3, record));
    EXPECT_EQ(record.keysize, 0);
}

TEST(SysResource, XmlRoundTripKeepsTypeKeysizeAndProperties)
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
    EXPECT_EQ(back.Property("Arguments").toByteArray(), QByteArray("a b"));
    EXPECT_TRUE(back.IsProgram());
}

TEST(SysResource, XmlEdgeCases)
{
    QDomDocument document;
    QDomElement element = document.createElement(u"program"_s);
    SysResource record;
    record.type = 9;
    record.keysize = 3;
    record.ReadFromXML(element);
    EXPECT_EQ(record.type, 0u);
    EXPECT_EQ(record.keysize, 0);

    QDomElement bare = document.createElement(u"program"_s);
    record.WriteToXML(bare);
    EXPECT_TRUE(bare.firstChildElement(u"properties"_s).isNull());
    EXPECT_TRUE(bare.firstChildElement(u"data"_s).isNull());

    record.SetProperty("empty", QByteArray());
    record.SetProperty("blank", QString());
    QDomElement emptyProps = document.createElement(u"program"_s);
    record.WriteToXML(emptyProps);
    const QDomElement properties = emptyProps.firstChildElement(u"properties"_s);
    ASSERT_FALSE(properties.isNull());
    EXPECT_FALSE(properties.hasChildNodes());

    // Keysize is kept to 16 bits; unnamed properties and unknown children are ignored.
    QDomDocument odd;
    ASSERT_TRUE(odd.setContent(QByteArray("<program type='12' keysize='65539'><other/><PROPERTIES>"
                                          "<x name='' value='1'/><y name='n' value='v'/></PROPERTIES></program>")));
    record.ReadFromXML(odd.documentElement());
    EXPECT_EQ(record.type, 12u);
    EXPECT_EQ(record.keysize, 3);
    EXPECT_EQ(record.PropertyNames(), (QList<QByteArray>{"n"}));
    EXPECT_EQ(record.Property("n").toByteArray(), QByteArray("v"));
}

TEST(SysResource, CopiesCarryTheirOwnProperties)
{
    SysResource record;
    record.type = 1;
    record.data = "d";
    record.SetProperty("a", 1u);
    SysResource copy(record);
    copy.SetProperty("b", 2u);
    EXPECT_EQ(record.PropertyNames().size(), 1);
    EXPECT_EQ(copy.PropertyNames().size(), 2);
    QVector<SysResource> list;
    list.append(copy);
    record = list.first();
    list.clear();
    EXPECT_EQ(record.Property("b").toUInt(), 2u);
    EXPECT_EQ(record.data, QByteArray("d"));
}

} // namespace
