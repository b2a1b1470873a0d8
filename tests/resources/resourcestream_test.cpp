#include "resources/resourcestream.h"

#include "bytes.h"
#include "support/testutil.h"

#include <QRandomGenerator>
#include <QTemporaryDir>
#include <QtEndian>

#include <gtest/gtest.h>

#include <array>

using namespace Qt::StringLiterals;

namespace {

using testutil::ReadFile;

using resourcebytes::Hex;
using resourcebytes::LittleEndian;
using resourcebytes::U16s;
using resourcebytes::U32s;

// {type, first ID, additional IDs, offset index}
using MapEntry = std::array<quint16, 4>;

// A resource file put together by hand: the header's resource count as given, the map entries and the offsets as given.
QByteArray Compose(const QVector<MapEntry> &map, const QVector<quint32> &offsets, const QByteArray &data,
                   quint32 resourceCount)
{
    const auto m = quint32(map.size());
    QByteArray out = QByteArray("\x11\0", 2) + U16s({1, 1, m})
        + U32s({32, 8 * m, 32 + 8 * m, resourceCount, 32 + 8 * m + 4 * quint32(offsets.size()), quint32(data.size())});
    for (const MapEntry &entry : map)
        out += LittleEndian(entry, 2);
    return out + LittleEndian(offsets, 4) + data;
}

// A file that uses every feature: a shared block, an empty block, a range.
QByteArray RichFile()
{
    // Map 4 entries (32 bytes) and 6 offsets (24 bytes): data at 88.
    return Compose({{1, 6, 0, 0}, {5, 10, 2, 1}, {5, 20, 0, 0}, {7, 1, 0, 4}}, {88, 91, 91, 95, 96, 96}, "abcwxyz!", 5);
}

// 20 map entries of 20 IDs each over 20 blocks, the last of `tail` bytes:
// 400 IDs in 276 + tail bytes, every range inside the blocks.
QByteArray ManyRanges(int tail)
{
    constexpr quint16 kEntries = 20;
    const quint32 data = 32 + 8 * kEntries + 4 * (kEntries + 1);
    QVector<MapEntry> map;
    for (quint16 type = 1; type <= kEntries; ++type)
        map.append({type, 0, kEntries - 1, 0});
    QVector<quint32> offsets(kEntries, data);
    offsets.append(data + quint32(tail));
    return Compose(map, offsets, QByteArray(tail, 'z'), kEntries);
}

QByteArray Save(ResourceStream &stream)
{
    QByteArray bytes;
    EXPECT_TRUE(stream.SaveTo(bytes));
    return bytes;
}

TEST(ResourceStream, OnePairOfFiveBytesSavesAs53BytesAndDumpsAsWritten)
{
    QTemporaryDir dir;
    ResourceStream stream;
    stream.AddResource(1, 1, "hello");
    ASSERT_TRUE(stream.Save(dir.filePath("one.kar")));
    const QByteArray expected = Hex("11 00 0100 0100 0100 20000000 08000000 28000000 01000000 30000000 05000000"
                                    "0100 0100 0000 0000"
                                    "30000000 35000000")
        + "hello";
    ASSERT_EQ(expected.size(), 53);
    EXPECT_EQ(ReadFile(dir.filePath("one.kar")), expected);
    EXPECT_EQ(Save(stream), expected);
    EXPECT_EQ(stream.Dump(),
              u"=== Header ===\n"
              "   FileType:             17(0x      11)\n"
              "   Version:              1(0x       1)\n"
              "   Oldest Code Version:  1(0x       1)\n"
              "   Number of Map Entries:1(0x       1)\n"
              "   Offset to Map:        32(0x      20)\n"
              "   Length of Map:        8(0x       8)\n"
              "   Offset to Entries:    40(0x      28)\n"
              "   Number of Resources:  1(0x       1)\n"
              "   Offset to Resources:  48(0x      30)\n"
              "   Length of Resources:  5(0x       5)\n"
              "=== FileMap ===\n"
              "   Entries:1\n"
              "   === FileMapEntry ===\n"
              "      Type:              1(0x       1)\n"
              "      Beginning Res ID:  1(0x       1)\n"
              "      Additional Res ID: 0(0x       0)\n"
              "      Offset Index:      0(0x       0)\n"
              "\n"
              "   === Offset Table ===\n"
              "      Count: 2\n"
              "      Offset: 48 (0x      30)\n"
              "      Offset: 53 (0x      35)\n"
              "=== Resources ===\n"
              "   Number of: 1\n"
              "    Resource: 5\n"_s);
}

// Equal blocks are stored once (the first one's index wins, an empty block
// keeps an index of its own) and the offset table repeats its end.
TEST(ResourceEntry, OrdersByTypeThenIdOrInModeOneByTheBlockAsText)
{
    const ResourceEntry a{0, 1, 9, "b"}, b{0, 2, 1, "a"}, c{0, 2, 3, "a"};
    EXPECT_TRUE(a < b && b < c && !(c < b) && !(b < b));
    const ResourceEntry x{1, 1, 9, "b"}, y{1, 2, 1, "a"}, z{1, 2, 3, "a"};
    EXPECT_TRUE(y < x && !(x < y) && !(y < z));
}

TEST(ResourceStream, EqualBlocksAreStoredOnce)
{
    ResourceStream stream;
    stream.AddResource(1, 1, "a");
    stream.AddResource(1, 2, "");
    stream.AddResource(1, 3, "b");
    stream.AddResource(1, 4, "a");
    stream.AddResource(2, 1, "b");
    stream.AddResource(2, 2, QByteArray());
    const QByteArray bytes = Save(stream);
    // 6 map entries from 32, 7 offsets from 80, the blocks "a", "" and "b" from 108.
    EXPECT_EQ(bytes.left(32), QByteArray("\x11\0", 2) + U16s({1, 1, 6}) + U32s({32, 48, 80, 6, 108, 2}));
    const quint16 expectedIndexes[] = {0, 1, 2, 0, 2, 1};
    for (int i = 0; i < 6; ++i)
        EXPECT_EQ(qFromLittleEndian<quint16>(bytes.constData() + 32 + 8 * i + 6), expectedIndexes[i]) << i;
    EXPECT_EQ(bytes.mid(80), U32s({108, 109, 109, 110, 110, 110, 110}) + "ab");

    ResourceStream loaded;
    ASSERT_TRUE(loaded.LoadFrom(bytes));
    EXPECT_EQ(loaded.GetResource(1, 4), QByteArray("a"));
    EXPECT_TRUE(loaded.GetResource(1, 2).isEmpty());
    EXPECT_FALSE(loaded.GetResource(1, 2).isNull());
    EXPECT_EQ(loaded.GetResource(2, 1), QByteArray("b"));
    EXPECT_EQ(Save(loaded), bytes);
}

TEST(ResourceStream, RichFileLoadsAndOverlappingRangesLetTheFirstEntryWin)
{
    ResourceStream stream;
    ASSERT_TRUE(stream.LoadFrom(RichFile()));
    QVector<ResourceEntry> entries;
    ASSERT_EQ(stream.GetResources(entries), 6u);
    EXPECT_EQ(stream.GetResourceHeader()->resourceCount, 5u);
    QVector<quint16> ids;
    EXPECT_EQ(stream.GetResourceIDs(5, ids), 4u);
    EXPECT_EQ(ids, (QVector<quint16>{10, 11, 12, 20}));
    EXPECT_EQ(stream.GetResource(1, 6), QByteArray("abc"));
    EXPECT_TRUE(stream.GetResource(5, 10).isEmpty());
    EXPECT_EQ(stream.GetResource(5, 11), QByteArray("wxyz"));
    EXPECT_EQ(stream.GetResource(5, 12), QByteArray("!"));
    EXPECT_EQ(stream.GetResource(5, 20), QByteArray("abc"));
    EXPECT_TRUE(stream.GetResource(7, 1).isEmpty());

    const QByteArray overlap = Compose({{3, 1, 1, 0}, {3, 2, 0, 2}}, {48 + 12, 61, 62, 63}, "xyz", 3);
    ResourceStream second;
    ASSERT_TRUE(second.LoadFrom(overlap));
    EXPECT_EQ(second.GetResource(3, 2), QByteArray("y"));
}

TEST(ResourceStream, EmptiedTypeStaysListedAndIsNotWritten)
{
    ResourceStream stream;
    stream.AddResource(4, 1, "x");
    stream.AddResource(9, 1, "y");
    stream.DeleteResource(4, 1);
    stream.DeleteResource(4, 2);
    stream.DeleteResource(8, 1);
    QVector<quint16> types;
    EXPECT_EQ(stream.GetResourceTypes(types), 2u);
    EXPECT_EQ(types, (QVector<quint16>{4, 9}));
    QVector<quint16> ids;
    EXPECT_EQ(stream.GetResourceIDs(4, ids), 0u);
    ResourceStream loaded;
    ASSERT_TRUE(loaded.LoadFrom(Save(stream)));
    EXPECT_EQ(loaded.GetResourceTypes(types), 1u);
    EXPECT_EQ(types.first(), 9);
    EXPECT_TRUE(stream.GetResource(4, 1).isNull());
}

TEST(ResourceStream, SaveWithoutPathWritesBackToTheLoadedFileAndFailuresLeaveFilesAlone)
{
    QTemporaryDir dir;
    const QString path = dir.filePath("back.kar");
    ResourceStream first;
    first.AddResource(1, 1, "one");
    ASSERT_TRUE(first.Save(path));

    ResourceStream stream;
    EXPECT_FALSE(stream.Save(QString()));
    ASSERT_TRUE(stream.Load(path));
    EXPECT_EQ(stream.Name(), path);
    stream.AddResource(1, 2, "two");
    ASSERT_TRUE(stream.Save(QString()));
    EXPECT_EQ(ReadFile(path), Save(stream));

    // Failures leave the file alone.
    const QString keep = dir.filePath(u"keep.kar"_s);
    testutil::WriteFile(keep, "old");
    ResourceStream empty;
    EXPECT_FALSE(empty.Save(keep));
    QByteArray bytes("untouched");
    EXPECT_FALSE(empty.SaveTo(bytes));
    EXPECT_EQ(bytes, QByteArray("untouched"));
    EXPECT_FALSE(stream.Save(dir.filePath("no/such/dir/x.kar")));
    EXPECT_EQ(ReadFile(keep), QByteArray("old"));
    EXPECT_FALSE(stream.Load(dir.filePath("missing.kar")));
    EXPECT_FALSE(stream.Load(QString()));
}

TEST(ResourceStream, At65535PairsSavesAndOneMoreIsRefused)
{
    ResourceStream stream;
    for (int i = 0; i < 65535; ++i)
        stream.AddResource(quint16(1 + i / 65536), quint16(i), QByteArray::number(i % 1000));
    QByteArray bytes;
    ASSERT_TRUE(stream.SaveTo(bytes));
    EXPECT_EQ(stream.GetResourceHeader()->resourceCount, 65535u);
    EXPECT_EQ(stream.GetResourceHeader()->lengthOfResources, quint32(10 * 1 + 90 * 2 + 900 * 3));
    ResourceStream loaded;
    ASSERT_TRUE(loaded.LoadFrom(bytes));
    EXPECT_EQ(loaded.GetResource(1, 61234), QByteArray("234"));

    stream.AddResource(2, 0, "x");
    QByteArray more("keep");
    EXPECT_FALSE(stream.SaveTo(more));
    EXPECT_EQ(more, QByteArray("keep"));
}

// Corrupt input, every prefix of a valid file among it, is refused and leaves the stream as it was.
TEST(ResourceStream, CorruptInputIsRefusedAndChangesNothing)
{
    QList<QPair<QString, QByteArray>> inputs
        = {{u"HugeResourceCount"_s, Compose({}, {}, QByteArray(), 0xFFFFFFFFu)},
           {u"MapCountPastInput"_s, Compose({{1, 1, 0, 0}}, {48, 49}, "x", 1).left(40)},
           {u"OffsetsRunBackwards"_s, Compose({{1, 1, 0, 0}, {1, 2, 0, 1}}, {60, 62, 61}, "xy", 2)},
           {u"OffsetPastInput"_s, Compose({{1, 1, 0, 0}}, {48, 4000}, "x", 1)},
           {u"OffsetIndexPastBlocks"_s, Compose({{1, 1, 0, 1}}, {48, 49}, "x", 1)},
           {u"RangePastBlocks"_s, Compose({{5, 10, 3, 0}}, {52, 53, 55, 58}, "ABBCCC", 3)},
           {u"RangesCoverMoreIdsThanInputBytes"_s, ManyRanges(123)}};
    const QByteArray file = RichFile();
    for (int length = 0; length < file.size(); ++length)
        inputs.append({u"the first %1 bytes"_s.arg(length), file.left(length)});
    for (const auto &[what, bytes] : std::as_const(inputs)) {
        ResourceStream stream;
        stream.AddResource(3, 3, "kept");
        EXPECT_FALSE(stream.LoadFrom(bytes)) << what.toStdString();
        EXPECT_EQ(stream.GetResource(3, 3), QByteArray("kept")) << what.toStdString();
        EXPECT_EQ(stream.GetResourceHeader()->resourceCount, 0u) << what.toStdString();
    }
    EXPECT_TRUE(ResourceStream().LoadFrom(file));
}

// As many IDs as the input has bytes load; a cleared stream reads as new.
TEST(ResourceStream, LoadsAsManyIdsAsInputBytesAndClearsToNew)
{
    ResourceStream stream;
    ASSERT_TRUE(stream.LoadFrom(ManyRanges(124)));
    QVector<ResourceEntry> entries;
    EXPECT_EQ(stream.GetResources(entries), 400u);
    EXPECT_EQ(stream.GetResource(20, 19), QByteArray(124, 'z'));
    stream.Clear();
    EXPECT_EQ(stream.GetResources(entries), 0u);
    EXPECT_EQ(stream.Dump(), ResourceStream().Dump());
}

TEST(ResourceStream, RandomByteFlipsLoadOrFailCleanly)
{
    ResourceStream source;
    for (quint16 i = 0; i < 20; ++i)
        source.AddResource(quint16(1 + i % 3), i, QByteArray(i % 7, char('a' + i % 5)));
    const QByteArray file = Save(source);
    QRandomGenerator random(20261206);
    int loaded = 0;
    for (int round = 0; round < 3000; ++round) {
        QByteArray bytes = file;
        const int flips = 1 + int(random.bounded(4));
        for (int f = 0; f < flips; ++f)
            bytes[int(random.bounded(bytes.size()))] = char(random.bounded(256));
        ResourceStream stream;
        if (!stream.LoadFrom(bytes))
            continue;
        ++loaded;
        QVector<ResourceEntry> entries;
        stream.GetResources(entries);
        // Never more table entries than the input has bytes.
        EXPECT_LE(qint64(entries.size()), qint64(bytes.size()));
        for (const ResourceEntry &entry : std::as_const(entries))
            EXPECT_LE(entry.data.size(), bytes.size());
        stream.Dump();
    }
    EXPECT_GT(loaded, 0);
}

} // namespace
