#include "archive/tar.h"

#include "support/testutil.h"

#include <QDir>
#include <QFile>
#include <QRandomGenerator>
#include <QSet>
#include <QTemporaryDir>

#include <gtest/gtest.h>

#include <cstring>

#include <unistd.h>

using namespace Qt::StringLiterals;

class TarTestAccess
{
public:
    static void PutOctalNumber(signed char *field, unsigned int width, int value, bool checksumStyle)
    {
        Tar::PutOctalNumber(field, width, value, checksumStyle);
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

// The member names of an archive, without the end blocks.
QStringList Names(const Tar &tar)
{
    QStringList names;
    for (unsigned int i = 0; i < tar.EntryCount(); ++i) {
        if (!tar.Entry(i).name.isEmpty())
            names.append(tar.Entry(i).name);
    }
    return names;
}

// A header block with a valid checksum (summed over signed bytes when asked). size is the raw 12-byte size field.
QByteArray Header(const QByteArray &name, const QByteArray &size, char type = '0', const QByteArray &link = {},
                  bool signedSum = false)
{
    QByteArray block(512, '\0');
    std::memcpy(block.data(), name.constData(), size_t(std::min<qsizetype>(name.size(), 100)));
    std::memcpy(block.data() + 157, link.constData(), size_t(std::min<qsizetype>(link.size(), 100)));
    std::memcpy(block.data() + 100, "0000644", 7);
    std::memcpy(block.data() + 124, size.constData(), size_t(std::min<qsizetype>(size.size(), 12)));
    block[156] = type;
    std::memcpy(block.data() + 257, "ustar\00000", 8); // magic "ustar\0", version "00"
    std::memset(block.data() + 148, ' ', 8);
    int sum = 0;
    for (const char c : block)
        sum += signedSum ? static_cast<signed char>(c) : static_cast<unsigned char>(c);
    std::memcpy(block.data() + 148, QByteArray::number(sum, 8).rightJustified(6, '0').constData(), 6);
    block[154] = '\0';
    return block;
}

QByteArray Octal(qint64 size)
{
    return QByteArray::number(size, 8).rightJustified(11, '0');
}

// Data padded to whole blocks.
QByteArray Padded(const QByteArray &data)
{
    return data + QByteArray(int((512 - data.size() % 512) % 512), '\0');
}

QByteArray Member(const QByteArray &name, const QByteArray &data, char type = '0')
{
    return Header(name, Octal(data.size()), type) + Padded(data);
}

QByteArray PaxRecord(const QByteArray &key, const QByteArray &value)
{
    const QByteArray body = " " + key + "=" + value + "\n";
    int length = int(body.size()) + 1;
    while (QByteArray::number(length).size() + body.size() != length)
        ++length;
    return QByteArray::number(length) + body;
}

const QByteArray kEnd(1024, '\0');

class TarTest : public ::testing::Test
{
protected:
    void SetUp() override { ASSERT_TRUE(dir.isValid()); }
    QString Path(const QString &name) const { return dir.filePath(name); }

    QTemporaryDir dir;
};

// ---- Archives written by other programs, checked against what GNU tar extracts ----

struct Writer
{
    const char *label;
    // GNU tar options, or a Python tarfile format name after "python:".
    QStringList options;
    // Longest name the format holds (0: any); the tree leaves longer ones out.
    int maxName;
    bool sparse;
};

class ForeignArchive : public TarTest, public ::testing::WithParamInterface<Writer>
{
protected:
    void SetUp() override
    {
        TarTest::SetUp();
        for (const QString &program : {u"tar"_s, u"python3"_s}) {
            if (!testutil::HaveProgram(program))
                GTEST_SKIP() << program.toStdString() << " is not installed";
        }
    }
};

TEST_P(ForeignArchive, ReadsEveryMemberAsGnuTarExtractsIt)
{
    const Writer &writer = GetParam();
    // A tree with every kind of member the format holds.
    const QString source = Path("src");
    WriteFile(source + u"/pkg/a.mif"_s, Bytes(1500, 'a'));
    WriteFile(source + u"/pkg/empty"_s, QByteArray());
    ASSERT_TRUE(QDir(source).mkpath(u"pkg/emptydir"_s));
    ASSERT_TRUE(QFile::link(u"a.mif"_s, source + u"/pkg/link"_s));
    ASSERT_EQ(::link(QFile::encodeName(source + u"/pkg/a.mif"_s).constData(),
                     QFile::encodeName(source + u"/pkg/hard"_s).constData()),
              0);
    const QString over100 = u"pkg/"_s + QString(60, u'd') + u'/' + QString(50, u'f');
    const QString over255 = u"pkg/"_s + QString(150, u'e') + u'/' + QString(130, u'g');
    for (const QString &name : {over100, over255}) {
        if (writer.maxName == 0 || name.size() + 2 <= writer.maxName)
            WriteFile(source + u'/' + name, Bytes(700, 'L'));
    }
    if (writer.sparse) {
        // Data at 64 KiB and at 160 KiB of a 256 KiB file; the rest holes.
        QFile file(source + u"/pkg/sparse"_s);
        ASSERT_TRUE(file.open(QIODevice::WriteOnly));
        for (const qint64 at : {64 * 1024, 160 * 1024}) {
            ASSERT_TRUE(file.seek(at));
            ASSERT_EQ(file.write(Bytes(8192, char(at / 1024))), 8192);
        }
        ASSERT_TRUE(file.resize(256 * 1024));
    }

    const QString archive = Path("archive.tar");
    QByteArray output;
    const QString script = u"import sys, tarfile\n"
                           "with tarfile.open(sys.argv[1], 'w', format=getattr(tarfile, sys.argv[2])) as t:\n"
                           "    t.add(sys.argv[3], arcname='.')\n"_s;
    const bool python = writer.options.first().startsWith(u"python:"_s);
    const QStringList arguments = python
        ? QStringList{u"-c"_s, script, archive, writer.options.first().mid(7), source}
        : writer.options + QStringList{u"--sort=name"_s, u"-cf"_s, archive, u"-C"_s, source, u"."_s};
    ASSERT_EQ(RunProgram(python ? u"python3"_s : u"tar"_s, arguments, &output), 0) << output.constData();
    const QString out = Path("out");
    ASSERT_TRUE(QDir().mkpath(out));
    ASSERT_EQ(RunProgram(u"tar"_s, {u"-xf"_s, archive, u"-C"_s, out}, &output), 0) << output.constData();

    Tar tar;
    ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, archive));
    EXPECT_FALSE(tar.IsDamaged()) << tar.ErrorString().toStdString();
    QSet<QString> listed;
    for (unsigned int i = 0; i < tar.EntryCount(); ++i) {
        TarFileEntry entry = tar.Entry(i);
        const QString relative = QDir::cleanPath(entry.name);
        if (entry.name.isEmpty() || relative == u"."_s)
            continue;
        SCOPED_TRACE(relative.toStdString());
        listed.insert(relative);
        const QFileInfo extracted(out + u'/' + relative);
        if (entry.IsSymLink()) {
            EXPECT_TRUE(extracted.isSymLink());
            EXPECT_EQ(entry.linkName, QFile::symLinkTarget(extracted.filePath()).section(u'/', -1));
        } else if (entry.IsDirectory()) {
            EXPECT_TRUE(extracted.isDir());
        } else {
            ASSERT_TRUE(entry.IsFile());
            EXPECT_EQ(entry.size, quint32(extracted.size()));
            EXPECT_EQ(tar.EntryData(entry), ReadFile(extracted.filePath()));
        }
    }
    const QStringList onDisk = testutil::Tree(out);
    EXPECT_EQ(listed, QSet<QString>(onDisk.begin(), onDisk.end()));
    EXPECT_EQ(listed.contains(u"pkg/sparse"_s), writer.sparse);
}

INSTANTIATE_TEST_SUITE_P(
    Tar, ForeignArchive,
    ::testing::Values(Writer{"Gnu", {u"--format=gnu"_s}, 0, false}, Writer{"OldGnu", {u"--format=oldgnu"_s}, 0, false},
                      Writer{"Posix", {u"--format=posix"_s}, 0, false},
                      Writer{"Ustar", {u"--format=ustar"_s}, 256, false}, Writer{"V7", {u"--format=v7"_s}, 99, false},
                      Writer{"GnuSparse", {u"--format=gnu"_s, u"--sparse"_s}, 0, true},
                      Writer{"OldGnuSparse", {u"--format=oldgnu"_s, u"--sparse"_s}, 0, true},
                      Writer{"PaxSparse00", {u"--format=posix"_s, u"--sparse"_s, u"--sparse-version=0.0"_s}, 0, true},
                      Writer{"PaxSparse01", {u"--format=posix"_s, u"--sparse"_s, u"--sparse-version=0.1"_s}, 0, true},
                      Writer{"PaxSparse10", {u"--format=posix"_s, u"--sparse"_s, u"--sparse-version=1.0"_s}, 0, true},
                      Writer{"PythonPax", {u"python:PAX_FORMAT"_s}, 0, false},
                      Writer{"PythonGnu", {u"python:GNU_FORMAT"_s}, 0, false},
                      Writer{"PythonUstar", {u"python:USTAR_FORMAT"_s}, 256, false}),
    [](const auto &info) { return std::string(info.param.label); });

// ---- Hand-made archives: odd but valid fields, and damage ----

QByteArray Base256(quint64 value)
{
    QByteArray field(12, '\0');
    field[0] = char(0x80);
    for (int i = 11; i > 0 && value; --i, value >>= 8)
        field[i] = char(value & 0xFF);
    return field;
}

QByteArray RandomBytes(int size, quint32 seed)
{
    QByteArray bytes(size, Qt::Uninitialized);
    QRandomGenerator random(seed);
    for (char &c : bytes)
        c = char(random.bounded(256));
    return bytes;
}

// A hand-made archive, the members listed (end blocks left out), the first
// one's bytes, and the reason given for damage (empty when it is sound).
struct Crafted
{
    const char *label;
    QByteArray bytes;
    QStringList names;
    QByteArray firstData;
    const char *error;
};

Crafted Row(const char *label, const QByteArray &bytes, const QStringList &names = {}, const QByteArray &firstData = {},
            const char *error = "")
{
    return {label, bytes, names, firstData, error};
}

const QByteArray kLongPaxName = QByteArray(300, 'p') + "/name.mif";
const char *const kNotATar = "does not look like a tar archive";

const Crafted kCrafted[] = {
    // Blanks before the digits; a blank ends them.
    Row("SizeWithBlanks", Header("a", "     5 7") + Padded("hello") + Member("b", "x") + kEnd, {"a", "b"}, "hello"),
    Row("SizeWithLeadingNulsAndNoTerminator", Header("a", QByteArray(7, '\0') + "00005") + Padded("hello") + kEnd,
        {"a"}, "hello"),
    Row("Base256Size", Header("a", Base256(5)) + Padded("hello") + kEnd, {"a"}, "hello"),
    Row("Base256SizeOver4GiB", Member("a", "x") + Header("big", Base256(quint64(1) << 32)), {"a"}, "x",
        "member big at offset 1024 is larger than 4 GiB - 1 bytes: not supported"),
    Row("OctalSizeOver4GiB", Header("huge", "77777777777") + Padded("hello"), {}, {},
        "member huge at offset 0 is larger than 4 GiB - 1 bytes: not supported"),
    Row("NegativeBase256Size", Member("a", "x") + Header("neg", QByteArray(12, char(0xFF))) + kEnd, {"a"}, "x",
        "invalid size field at offset 1024"),
    Row("SizeWithJunkAfterTheDigits", Member("a", "x") + Header("b", "0000000001x") + kEnd, {"a"}, "x",
        "invalid size field at offset 1024"),
    Row("DigitsEightAndNine", Member("a", "x") + Header("b", "00000000089") + kEnd, {"a"}, "x",
        "invalid size field at offset 1024"),
    Row("BadChecksum", Member("a", "x") + Member("b", "yy").replace(0, 1, "c") + kEnd, {"a"}, "x",
        "checksum error at offset 1024"),
    // A name byte of 0xE9 adds 233 unsigned but -23 signed.
    Row("SignedChecksumIsAccepted", Header("\xe9t\xc3\xa9", Octal(1), '0', {}, true) + Padded("s") + kEnd,
        {"\\351t\\303\\251"}, "s"),
    Row("TruncatedMember", Member("a", "x") + Header("b", Octal(3000)) + Bytes(1000, 'b'), {"a"}, "x",
        "unexpected end of archive at offset 2536"),
    Row("PaddingCutShort", Member("a", "x").left(600), {"a"}, "x", "unexpected end of archive at offset 600"),
    Row("TruncatedHeader", Member("a", "x") + QByteArray(100, 'h'), {"a"}, "x",
        "unexpected end of archive at offset 1124"),
    Row("RandomBytes", RandomBytes(5000, 17), {}, {}, kNotATar),
    Row("TextFile", QByteArray("Package archives are tar files.\n").repeated(40), {}, {}, kNotATar),
    Row("ShortTextFile", "not an archive\n", {}, {}, kNotATar), Row("EmptyFile", {}),
    Row("NothingAfterTheEndBlocksIsListed", Member("a", "x") + kEnd + Member("late", "y") + kEnd, {"a"}, "x"),
    Row("DanglingLongNameNeverNamesTheEndBlocks", Member("././@LongLink", QByteArray("evil\0", 5), 'L') + kEnd),
    Row("VendorRecordsAreNotMembers",
        Member("acl", "user::rw-\n", 'A') + Member("sol", PaxRecord("mtime", "1"), 'X')
            + Member("glob", PaxRecord("comment", "hi"), 'g') + Member("a", "x") + kEnd,
        {"a"}, "x"),
    Row("PaxPathSizeAndGlobalPath",
        Member("g", PaxRecord("path", "global/x"), 'g')
            + Member("x", PaxRecord("path", kLongPaxName) + PaxRecord("size", "3"), 'x') + Header("short", Octal(999))
            + Padded("abc") + Member("plain", "q") + kEnd,
        {QString::fromLatin1(kLongPaxName), "global/x"}, "abc"),
    Row("SparseMemberThatIsAllHole",
        Member("x", PaxRecord("GNU.sparse.size", "1000") + PaxRecord("GNU.sparse.map", ""), 'x')
            + Header("hole", Octal(0)) + Member("after", "zzz") + kEnd,
        {"hole", "after"}, QByteArray(1000, '\0')),
    Row("SparseRunPastTheMember",
        Member("x", PaxRecord("GNU.sparse.size", "10") + PaxRecord("GNU.sparse.map", "8,4"), 'x')
            + Member("bad", "abcd") + kEnd,
        {}, {}, "invalid sparse map at offset 1024"),
    Row("PaxRecordWithoutNewline", Member("x", PaxRecord("path", "a").chopped(1) + " ", 'x') + Member("a", "x") + kEnd,
        {}, {}, "malformed extended header at offset 0"),
    Row("PaxRecordLongerThanItsHeader", Member("x", "99 path=a\n", 'x') + Member("a", "x") + kEnd, {}, {},
        "malformed extended header at offset 0"),
    Row("OversizedPaxHeader", Header("x", Octal(8 << 20), 'x') + kEnd, {}, {}, "extended header too large at offset 0"),
    Row("NameThatIsNotUtf8", Member("caf\xe9.mif", "x") + kEnd, {"caf\\351.mif"}, "x")};

class CraftedArchive : public TarTest, public ::testing::WithParamInterface<Crafted>
{
};

TEST_P(CraftedArchive, ListsWhatGnuTarListsAndSaysWhyItStops)
{
    const Crafted &c = GetParam();
    WriteFile(Path("crafted.tar"), c.bytes);
    Tar tar;
    ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, Path("crafted.tar")));
    EXPECT_EQ(Names(tar), c.names);
    EXPECT_EQ(tar.ErrorString(), QString::fromUtf8(c.error));
    EXPECT_EQ(tar.IsDamaged(), *c.error != '\0');
    if (!c.names.isEmpty()) {
        TarFileEntry first = tar.Entry(0);
        EXPECT_EQ(tar.EntryData(first), c.firstData);
    }
}

INSTANTIATE_TEST_SUITE_P(Tar, CraftedArchive, ::testing::ValuesIn(kCrafted),
                         [](const auto &info) { return std::string(info.param.label); });

TEST_F(TarTest, HardLinkAndNonUtf8NameKeepTheirDetails)
{
    // The link names "./a/", the latest member of that name.
    WriteFile(Path("links.tar"),
              Member("a\xff", "one") + Member("a", "one") + Member("a", "two") + Header("b", Octal(0), '1', "./a/")
                  + Header("c", Octal(0), '1', "none") + kEnd);
    Tar tar;
    ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, Path("links.tar")));
    ASSERT_FALSE(tar.IsDamaged()) << tar.ErrorString().toStdString();
    EXPECT_EQ(tar.Entry(0).rawName, QByteArray("a\xff"));
    TarFileEntry hard = tar.Entry(3);
    EXPECT_TRUE(hard.IsFile());
    EXPECT_EQ(hard.linkName, u"./a/"_s);
    EXPECT_EQ(tar.EntryData(hard), QByteArray("two"));
    const TarFileEntry dangling = tar.Entry(4);
    EXPECT_TRUE(dangling.IsHardLink());
    EXPECT_FALSE(dangling.IsFile());
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

TEST_F(TarTest, WritesWhatOurReaderAndGnuTarReadBack)
{
    const QString deep = QString(70, u'p') + u"/"_s + QString(95, u'q');
    Tar writer;
    writer.SetModificationTime(1700000000);
    writer.AddDirectory(u"mods"_s);
    writer.AddFile(u"mods/a.mif"_s, Bytes(513, 'm'));
    writer.AddFile(u"mods/empty"_s, QByteArray());
    writer.AddFile(u"mods/"_s + deep, Bytes(512, 'd'));
    writer.AddFile(u"mods/caf\u00e9.txt"_s, "bonjour\n");
    ASSERT_TRUE(writer.Write(Path("ours.tar")));
    // Headers and data in whole blocks, then the two end blocks.
    EXPECT_EQ(QFileInfo(Path("ours.tar")).size(), (1 + 3 + 1 + 2 + 2 + 2) * 512);

    Tar reader;
    ASSERT_TRUE(reader.Open(QIODevice::ReadOnly, Path("ours.tar")));
    EXPECT_TRUE(reader.IsOpen());
    EXPECT_FALSE(reader.IsDamaged());
    ASSERT_EQ(reader.EntryCount(), 7u);
    EXPECT_TRUE(reader.Entry(0).IsDirectory());
    EXPECT_EQ(reader.Entry(0).name, u"mods/"_s);
    TarFileEntry first = reader.Entry(1);
    EXPECT_EQ(first.offset, 2 * 512);
    EXPECT_TRUE(first.IsFile());
    EXPECT_EQ(reader.EntryData(first), Bytes(513, 'm'));
    TarFileEntry entry = reader.Entry(3);
    EXPECT_EQ(entry.name, u"mods/"_s + deep);
    EXPECT_EQ(reader.EntryData(entry), Bytes(512, 'd'));
    for (unsigned int i = 5; i < 7; ++i) {
        EXPECT_TRUE(reader.Entry(i).name.isEmpty());
        EXPECT_EQ(reader.Entry(i).size, 0u);
        EXPECT_FALSE(reader.Entry(i).IsFile());
    }

    if (!testutil::HaveProgram(u"tar"_s))
        GTEST_SKIP() << "GNU tar is not installed";
    ASSERT_TRUE(QDir(dir.path()).mkpath(u"out"_s));
    QByteArray messages;
    ASSERT_EQ(RunProgram(u"tar"_s, {u"-xf"_s, u"ours.tar"_s, u"-C"_s, u"out"_s}, &messages, dir.path()), 0);
    EXPECT_TRUE(messages.isEmpty()) << messages.constData();
    EXPECT_EQ(ReadFile(Path("out/mods/a.mif")), Bytes(513, 'm'));
    EXPECT_TRUE(QFileInfo(Path("out/mods/empty")).isFile());
    EXPECT_EQ(QFileInfo(Path("out/mods/empty")).size(), 0);
    EXPECT_EQ(ReadFile(Path("out/mods/") + deep), Bytes(512, 'd'));
    EXPECT_EQ(ReadFile(Path("out/mods/caf\u00e9.txt")), QByteArray("bonjour\n"));
    EXPECT_EQ(QFileInfo(Path("out/mods/a.mif")).lastModified().toSecsSinceEpoch(), 1700000000);
}

TEST_F(TarTest, WriteRefusesNamesThatDoNotFitAndLeavesTheDestination)
{
    WriteFile(Path("keep.tar"), "old");
    for (const QString &name : {QString(), QString(101, u'n'), u"dir/"_s}) {
        Tar writer;
        writer.AddFile(u"fine"_s, "1");
        writer.AddFile(name, "2");
        EXPECT_FALSE(writer.Write(Path("keep.tar"))) << name.toStdString();
        EXPECT_EQ(ReadFile(Path("keep.tar")), QByteArray("old"));
    }
    Tar writer;
    EXPECT_FALSE(writer.Write(Path("no/such/folder/x.tar")));
}

// A failed Open keeps the entries but leaves nothing open; a copy shares the
// entries but never the open file, and assigning closes the file it had.
TEST_F(TarTest, FailedOpenAndCopiesKeepTheEntriesButNoOpenFile)
{
    Tar writer;
    writer.AddFile(u"a"_s, "abc");
    ASSERT_TRUE(writer.Write(Path("a.tar")));
    Tar tar;
    EXPECT_FALSE(tar.Open(QIODevice::ReadOnly));
    ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, Path("a.tar")));
    {
        Tar copy(tar);
        EXPECT_FALSE(copy.IsOpen());
        EXPECT_EQ(copy.EntryCount(), 3u);
        Tar assigned;
        ASSERT_TRUE(assigned.Open(QIODevice::ReadOnly, Path("a.tar")));
        assigned = tar;
        EXPECT_FALSE(assigned.IsOpen());
        ASSERT_TRUE(assigned.Open(QIODevice::ReadOnly));
        EXPECT_EQ(assigned.EntryCount(), 3u); // a new Open lists afresh
        TarFileEntry entry = assigned.Entry(0);
        EXPECT_EQ(assigned.EntryData(entry), QByteArray("abc"));
    }
    TarFileEntry entry = tar.Entry(0);
    EXPECT_EQ(tar.EntryData(entry), QByteArray("abc"));

    EXPECT_FALSE(tar.Open(QIODevice::ReadOnly, Path("missing.tar")));
    EXPECT_FALSE(tar.IsOpen());
    EXPECT_EQ(tar.EntryCount(), 3u);
    EXPECT_TRUE(tar.EntryData(entry).isNull());
    EXPECT_TRUE(tar.Entry(tar.EntryCount()).name.isEmpty());
}

TEST_F(TarTest, CorruptedArchivesAreReportedAndReadOnlyWhatTheFileHolds)
{
    Tar writer;
    writer.SetModificationTime(1700000000);
    writer.AddDirectory(u"pkg"_s);
    writer.AddFile(u"pkg/a.mif"_s, Bytes(600, 'a'));
    writer.AddFile(QString(90, u'd') + u"/"_s + QString(90, u'f'), Bytes(30, 'f'));
    ASSERT_TRUE(writer.Write(Path("good.tar")));
    const QByteArray good = ReadFile(Path("good.tar"));

    QRandomGenerator random(7411);
    int damaged = 0;
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
        EXPECT_EQ(tar.IsDamaged(), !tar.ErrorString().isEmpty());
        damaged += tar.IsDamaged() ? 1 : 0;
        EXPECT_LE(qint64(tar.EntryCount()), bytes.size() / 512 + 1);
        for (unsigned int i = 0; i < tar.EntryCount(); ++i) {
            TarFileEntry entry = tar.Entry(i);
            EXPECT_EQ(tar.EntryData(entry).size(), qint64(entry.size));
        }
    }
    // Changed bytes in headers and cut members are noticed, not read on.
    EXPECT_GT(damaged, 100);
}

} // namespace
