#include "archive/tar.h"

#include "support/testutil.h"

#include <QDir>
#include <QFile>
#include <QRandomGenerator>
#include <QTemporaryDir>

#include <gtest/gtest.h>

#include <cstring>

class TarTestAccess
{
public:
    static void PutOctalNumber(signed char *field, unsigned int width, int value, bool checksumStyle)
    {
        Tar::PutOctalNumber(field, width, value, checksumStyle);
    }
    static unsigned int ReadOctal(const char *field)
    {
        return Tar::ReadOctal(reinterpret_cast<const signed char *>(field));
    }
};

namespace {

using testutil::ReadFile;
using testutil::RunProgram;
using testutil::WriteFile;

QByteArray Bytes(int size, char seed)
{
    QByteArray data(size, Qt::Uninitialized);
    for (int i = 0; i < size; ++i)
        data[i] = char(seed + i * 7);
    return data;
}

// A member named `name` by its index in the archive, or -1.
int Find(const Tar &tar, const QString &name)
{
    for (unsigned int i = 0; i < tar.EntryCount(); ++i) {
        if (tar.Entry(i).name == name)
            return int(i);
    }
    return -1;
}

class TarTest : public ::testing::Test
{
protected:
    void SetUp() override { ASSERT_TRUE(dir.isValid()); }
    QString Path(const QString &name) const { return dir.filePath(name); }

    // Runs GNU tar in the fixture folder.
    void GnuTar(const QStringList &arguments, QByteArray *output = nullptr)
    {
        if (!testutil::HaveProgram(QStringLiteral("tar")))
            GTEST_SKIP() << "GNU tar is not installed";
        QByteArray out;
        ASSERT_EQ(RunProgram(QStringLiteral("tar"), arguments, &out, dir.path()), 0) << out.constData();
        if (output)
            *output = out;
    }

    QTemporaryDir dir;
};

TEST_F(TarTest, OneTenByteMemberAndTheEndBlocksGiveThreeEntries)
{
    Tar writer;
    writer.SetModificationTime(1700000000);
    writer.AddFile(QStringLiteral("a.mif"), Bytes(10, 'a'));
    ASSERT_TRUE(writer.Write(Path("one.tar")));
    EXPECT_EQ(QFileInfo(Path("one.tar")).size(), 4 * 512);

    Tar tar;
    ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, Path("one.tar")));
    ASSERT_EQ(tar.EntryCount(), 3u);
    TarFileEntry first = tar.Entry(0);
    EXPECT_EQ(first.name, QStringLiteral("a.mif"));
    EXPECT_EQ(first.size, 10u);
    EXPECT_EQ(first.offset, 512);
    EXPECT_TRUE(first.IsFile());
    EXPECT_EQ(tar.EntryData(first), Bytes(10, 'a'));
    for (unsigned int i = 1; i < 3; ++i) {
        EXPECT_TRUE(tar.Entry(i).name.isEmpty());
        EXPECT_EQ(tar.Entry(i).size, 0u);
        EXPECT_FALSE(tar.Entry(i).IsFile());
    }
}

TEST_F(TarTest, GnuTarArchiveOfOneTenByteMemberGivesThreeEntries)
{
    WriteFile(Path("src/a.mif"), Bytes(10, 'g'));
    GnuTar({QStringLiteral("--format=ustar"), QStringLiteral("-b"), QStringLiteral("1"), QStringLiteral("-cf"),
            QStringLiteral("one.tar"), QStringLiteral("-C"), QStringLiteral("src"), QStringLiteral("a.mif")});
    if (HasFatalFailure() || IsSkipped())
        return;
    ASSERT_EQ(QFileInfo(Path("one.tar")).size(), 4 * 512);
    Tar tar;
    ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, Path("one.tar")));
    ASSERT_EQ(tar.EntryCount(), 3u);
    TarFileEntry entry = tar.Entry(0);
    EXPECT_EQ(entry.name, QStringLiteral("a.mif"));
    EXPECT_EQ(entry.size, 10u);
    EXPECT_EQ(entry.offset, 512);
    EXPECT_EQ(tar.EntryData(entry), Bytes(10, 'g'));
    EXPECT_TRUE(tar.Entry(2).name.isEmpty());
}

TEST_F(TarTest, ReadsArchivesMadeByGnuTar)
{
    const QString longDir = QStringLiteral("d") + QString(60, QLatin1Char('x'));
    const QString longName = longDir + QLatin1Char('/') + QString(90, QLatin1Char('y')) + QStringLiteral(".mif");
    ASSERT_GT(longName.size(), 100);
    WriteFile(Path("src/") + longName, Bytes(700, 'L'));
    WriteFile(Path("src/empty.bin"), QByteArray());
    WriteFile(Path("src/pkg/a.mif"), Bytes(1024, 'a'));
    ASSERT_TRUE(QDir(Path("src")).mkpath(QStringLiteral("emptydir")));

    for (const QString &format : {QStringLiteral("gnu"), QStringLiteral("posix"), QStringLiteral("ustar")}) {
        SCOPED_TRACE(format.toStdString());
        const QString archive = format + QStringLiteral(".tar");
        GnuTar({QStringLiteral("--format=") + format, QStringLiteral("-cf"), archive, QStringLiteral("-C"),
                QStringLiteral("src"), QStringLiteral("."), QStringLiteral("--sort=name")});
        if (HasFatalFailure() || IsSkipped())
            return;
        Tar tar;
        ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, Path(archive)));

        const int longIndex = Find(tar, QStringLiteral("./") + longName);
        ASSERT_GE(longIndex, 0);
        TarFileEntry entry = tar.Entry(unsigned(longIndex));
        EXPECT_EQ(entry.size, 700u);
        EXPECT_TRUE(entry.IsFile());
        EXPECT_EQ(tar.EntryData(entry), Bytes(700, 'L'));

        const int emptyIndex = Find(tar, QStringLiteral("./empty.bin"));
        ASSERT_GE(emptyIndex, 0);
        entry = tar.Entry(unsigned(emptyIndex));
        EXPECT_EQ(entry.size, 0u);
        const QByteArray empty = tar.EntryData(entry);
        EXPECT_FALSE(empty.isNull());
        EXPECT_TRUE(empty.isEmpty());

        const int dirIndex = Find(tar, QStringLiteral("./emptydir/"));
        ASSERT_GE(dirIndex, 0);
        EXPECT_TRUE(tar.Entry(unsigned(dirIndex)).IsDirectory());
        EXPECT_FALSE(tar.Entry(unsigned(dirIndex)).IsFile());

        const int fileIndex = Find(tar, QStringLiteral("./pkg/a.mif"));
        ASSERT_GE(fileIndex, 0);
        entry = tar.Entry(unsigned(fileIndex));
        EXPECT_EQ(tar.EntryData(entry), Bytes(1024, 'a'));
        // No name record of the long-name schemes is listed as a member.
        for (unsigned int i = 0; i < tar.EntryCount(); ++i)
            EXPECT_FALSE(tar.Entry(i).name.contains(QStringLiteral("LongLink"))) << i;
    }
}

TEST_F(TarTest, MemberCutShortByTheEndOfTheFileGivesTheBytesThatExist)
{
    WriteFile(Path("src/big.bin"), Bytes(5000, 'b'));
    GnuTar({QStringLiteral("--format=ustar"), QStringLiteral("-cf"), QStringLiteral("full.tar"),
            QStringLiteral("-C"), QStringLiteral("src"), QStringLiteral("big.bin")});
    if (HasFatalFailure() || IsSkipped())
        return;
    const QByteArray full = ReadFile(Path("full.tar"));
    WriteFile(Path("cut.tar"), full.left(512 + 3000));

    Tar tar;
    ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, Path("cut.tar")));
    ASSERT_EQ(tar.EntryCount(), 1u);
    TarFileEntry entry = tar.Entry(0);
    EXPECT_EQ(entry.size, 5000u);
    EXPECT_EQ(tar.EntryData(entry), Bytes(5000, 'b').left(3000));
}

TEST_F(TarTest, LongNameRecordNeverNamesTheEndBlocks)
{
    QByteArray header(512, '\0');
    std::memcpy(header.data(), "././@LongLink", 13);
    std::memcpy(header.data() + 124, "00000000005", 11);
    header[156] = 'L';
    QByteArray data(512, '\0');
    std::memcpy(data.data(), "evil", 4);
    WriteFile(Path("dangling.tar"), header + data + QByteArray(1024, '\0'));

    Tar tar;
    ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, Path("dangling.tar")));
    ASSERT_EQ(tar.EntryCount(), 2u);
    EXPECT_TRUE(tar.Entry(0).name.isEmpty());
    EXPECT_FALSE(tar.Entry(0).IsFile());
}

TEST_F(TarTest, HugeSizeFieldNeverAllocatesMoreThanTheFileHolds)
{
    QByteArray header(512, '\0');
    std::memcpy(header.data(), "huge", 4);
    std::memcpy(header.data() + 124, "77777777777", 11); // 8 GiB - 1
    WriteFile(Path("huge.tar"), header + Bytes(100, 'h'));

    Tar tar;
    ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, Path("huge.tar")));
    ASSERT_EQ(tar.EntryCount(), 1u);
    TarFileEntry entry = tar.Entry(0);
    EXPECT_EQ(entry.size, 0xFFFFFFFFu);
    EXPECT_EQ(tar.EntryData(entry), Bytes(100, 'h'));
    entry.offset = 1 << 30;
    EXPECT_TRUE(tar.EntryData(entry).isEmpty());
}

TEST_F(TarTest, SizeFieldWithLeadingBlanksReadsAsZero)
{
    EXPECT_EQ(TarTestAccess::ReadOctal("      12345\0"), 0u);
    EXPECT_EQ(TarTestAccess::ReadOctal("00000000012\0"), 10u);
    EXPECT_EQ(TarTestAccess::ReadOctal("17 \0"), 15u);
    // Twelve digits and no terminator: the field ends the number.
    EXPECT_EQ(TarTestAccess::ReadOctal("0000000000109999"), 010u);

    QByteArray header(1024, '\0');
    std::memcpy(header.data(), "blank", 5);
    std::memcpy(header.data() + 124, "         12", 11);
    WriteFile(Path("blank.tar"), header);
    Tar tar;
    ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, Path("blank.tar")));
    ASSERT_EQ(tar.EntryCount(), 2u);
    EXPECT_EQ(tar.Entry(0).size, 0u);
    EXPECT_EQ(tar.Entry(1).offset, 1024);
}

struct OctalCase
{
    unsigned int width;
    int value;
    bool checksumStyle;
    const char *expected; // width bytes; "=" marks a byte left unchanged
};

class PutOctalNumberTest : public ::testing::TestWithParam<OctalCase>
{
};

TEST_P(PutOctalNumberTest, WritesDigitsAndTerminatorOrLeavesTheField)
{
    const OctalCase &c = GetParam();
    signed char field[16];
    std::memset(field, '=', sizeof field);
    TarTestAccess::PutOctalNumber(field, c.width, c.value, c.checksumStyle);
    EXPECT_EQ(QByteArray(reinterpret_cast<char *>(field), int(c.width)), QByteArray(c.expected, int(c.width)));
    EXPECT_EQ(field[c.width], '=');
}

INSTANTIATE_TEST_SUITE_P(
    Tar, PutOctalNumberTest,
    ::testing::Values(OctalCase{8, 10, true, "000012\0 "}, OctalCase{8, 1 << 21, true, "========"},
                      OctalCase{8, (1 << 18) - 1, true, "777777\0 "}, OctalCase{8, 0644, false, "0000644\0"},
                      OctalCase{8, 1 << 21, false, "========"}, OctalCase{12, 10, false, "00000000012\0"},
                      OctalCase{12, 0x7FFFFFFF, false, "17777777777\0"}, OctalCase{0, 5, false, ""},
                      OctalCase{1, 0, false, "\0"}, OctalCase{1, 0, true, "="}, OctalCase{8, -1, false, "========"}));

TEST_F(TarTest, GnuTarListsAndExtractsWhatWeWrite)
{
    const QString deep = QString(70, QLatin1Char('p')) + QStringLiteral("/") + QString(95, QLatin1Char('q'));
    Tar writer;
    writer.SetModificationTime(1700000000);
    writer.AddDirectory(QStringLiteral("mods"));
    writer.AddFile(QStringLiteral("mods/a.mif"), Bytes(513, 'm'));
    writer.AddFile(QStringLiteral("mods/empty"), QByteArray());
    writer.AddFile(QStringLiteral("mods/") + deep, Bytes(512, 'd'));
    writer.AddFile(QStringLiteral("mods/caf\u00e9.txt"), "bonjour\n");
    ASSERT_TRUE(writer.Write(Path("ours.tar")));

    QByteArray listing;
    GnuTar({QStringLiteral("-tvf"), QStringLiteral("ours.tar")}, &listing);
    if (HasFatalFailure() || IsSkipped())
        return;
    EXPECT_TRUE(listing.contains("mods/a.mif")) << listing.constData();
    EXPECT_FALSE(listing.contains("warning")) << listing.constData();

    ASSERT_TRUE(QDir(dir.path()).mkpath(QStringLiteral("out")));
    QByteArray messages;
    GnuTar({QStringLiteral("-xf"), QStringLiteral("ours.tar"), QStringLiteral("-C"), QStringLiteral("out")}, &messages);
    EXPECT_TRUE(messages.isEmpty()) << messages.constData();
    EXPECT_EQ(ReadFile(Path("out/mods/a.mif")), Bytes(513, 'm'));
    EXPECT_TRUE(QFileInfo(Path("out/mods/empty")).isFile());
    EXPECT_EQ(QFileInfo(Path("out/mods/empty")).size(), 0);
    EXPECT_EQ(ReadFile(Path("out/mods/") + deep), Bytes(512, 'd'));
    EXPECT_EQ(ReadFile(Path("out/mods/caf\u00e9.txt")), QByteArray("bonjour\n"));
    EXPECT_EQ(QFileInfo(Path("out/mods/a.mif")).lastModified().toSecsSinceEpoch(), 1700000000);

    // And our reader gives the same members back.
    Tar reader;
    ASSERT_TRUE(reader.Open(QIODevice::ReadOnly, Path("ours.tar")));
    ASSERT_EQ(reader.EntryCount(), 7u);
    EXPECT_TRUE(reader.Entry(0).IsDirectory());
    EXPECT_EQ(reader.Entry(0).name, QStringLiteral("mods/"));
    TarFileEntry entry = reader.Entry(3);
    EXPECT_EQ(entry.name, QStringLiteral("mods/") + deep);
    EXPECT_EQ(reader.EntryData(entry), Bytes(512, 'd'));
}

TEST_F(TarTest, WriteRefusesNamesThatDoNotFitAndLeavesTheDestination)
{
    WriteFile(Path("keep.tar"), "old");
    const QString tooLong = QString(101, QLatin1Char('n'));
    for (const QString &name : {QString(), tooLong, QStringLiteral("dir/")}) {
        Tar writer;
        writer.AddFile(QStringLiteral("fine"), "1");
        writer.AddFile(name, "2");
        EXPECT_FALSE(writer.Write(Path("keep.tar"))) << name.toStdString();
        EXPECT_EQ(ReadFile(Path("keep.tar")), QByteArray("old"));
    }
    Tar writer;
    EXPECT_FALSE(writer.Write(Path("no/such/folder/x.tar")));
}

TEST_F(TarTest, FailedOpenKeepsTheEntriesAndLeavesNothingOpen)
{
    Tar writer;
    writer.AddFile(QStringLiteral("a"), "abc");
    ASSERT_TRUE(writer.Write(Path("a.tar")));
    Tar tar;
    EXPECT_FALSE(tar.Open(QIODevice::ReadOnly));
    ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, Path("a.tar")));
    ASSERT_EQ(tar.EntryCount(), 3u);
    EXPECT_FALSE(tar.Open(QIODevice::ReadOnly, Path("missing.tar")));
    EXPECT_FALSE(tar.IsOpen());
    EXPECT_EQ(tar.EntryCount(), 3u);
    const TarFileEntry past = tar.Entry(tar.EntryCount());
    EXPECT_TRUE(past.name.isEmpty());
    EXPECT_EQ(past.size, 0u);
    EXPECT_EQ(past.offset, 0);
    TarFileEntry entry = tar.Entry(0);
    EXPECT_TRUE(tar.EntryData(entry).isNull());
}

TEST_F(TarTest, CopiesShareEntriesButNeverTheOpenFile)
{
    Tar writer;
    writer.AddFile(QStringLiteral("a"), "abc");
    ASSERT_TRUE(writer.Write(Path("a.tar")));
    Tar original;
    ASSERT_TRUE(original.Open(QIODevice::ReadOnly, Path("a.tar")));
    {
        Tar copy(original);
        EXPECT_FALSE(copy.IsOpen());
        EXPECT_EQ(copy.EntryCount(), 3u);
        Tar assigned;
        assigned = original;
        EXPECT_FALSE(assigned.IsOpen());
        ASSERT_TRUE(assigned.Open(QIODevice::ReadOnly));
        TarFileEntry entry = assigned.Entry(0);
        EXPECT_EQ(assigned.EntryData(entry), QByteArray("abc"));
    }
    TarFileEntry entry = original.Entry(0);
    EXPECT_EQ(original.EntryData(entry), QByteArray("abc"));
}

TEST_F(TarTest, CorruptedArchivesListAndReadOnlyWhatTheFileHolds)
{
    Tar writer;
    writer.SetModificationTime(1700000000);
    writer.AddDirectory(QStringLiteral("pkg"));
    writer.AddFile(QStringLiteral("pkg/a.mif"), Bytes(600, 'a'));
    writer.AddFile(QString(90, QLatin1Char('d')) + QStringLiteral("/") + QString(90, QLatin1Char('f')), Bytes(30, 'f'));
    ASSERT_TRUE(writer.Write(Path("good.tar")));
    const QByteArray good = ReadFile(Path("good.tar"));

    QRandomGenerator random(7411);
    for (int round = 0; round < 400; ++round) {
        QByteArray bytes = good;
        if (round % 4 == 0) {
            bytes.truncate(int(random.bounded(good.size())));
        } else {
            for (int f = 0; f < 1 + round % 8; ++f)
                bytes[int(random.bounded(bytes.size()))] = char(random.bounded(256));
        }
        WriteFile(Path("bad.tar"), bytes);
        Tar tar;
        ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, Path("bad.tar")));
        EXPECT_LE(qint64(tar.EntryCount()), bytes.size() / 512 + 1);
        for (unsigned int i = 0; i < tar.EntryCount(); ++i) {
            TarFileEntry entry = tar.Entry(i);
            EXPECT_LE(tar.EntryData(entry).size(), bytes.size());
        }
    }
}

TEST_F(TarTest, FileThatIsNoArchiveOpensAndListsItsBlocks)
{
    WriteFile(Path("junk"), QByteArray(1300, 'z'));
    Tar tar;
    ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, Path("junk")));
    ASSERT_EQ(tar.EntryCount(), 2u);
    EXPECT_EQ(tar.Entry(0).name, QString(100, QLatin1Char('z')));
    EXPECT_EQ(tar.Entry(0).size, 0u);
}

} // namespace
