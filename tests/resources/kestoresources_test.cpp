#include "resources/kestoresources.h"

#include "bytes.h"
#include "encoding/qencoding.h"
#include "support/testutil.h"

#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

using resourcebytes::Hex;

TEST(KestoResources, NamesTheKnownTypesAndFormats)
{
    KestoResources resources;
    const std::pair<quint16, const char *> types[] = {{0x0001, "Strings"},
                                                      {0x0006, "Objects"},
                                                      {0x5000, "Binaries"},
                                                      {0x6000, "Sys Resource"},
                                                      {0x6001, "Granted Priviledges"},
                                                      {0x6002, "Required Priviledges"},
                                                      {0x6011, "Priviledge Data"},
                                                      {7, "Type: 7 (0x0007)"},
                                                      {4096, "Type: 4096 (0x1000)"},
                                                      {0xBEEF, "Type: 48879 (0xbeef)"}};
    for (const auto &[type, name] : types)
        EXPECT_EQ(resources.GetResourceTypeName(type), QString::fromLatin1(name));

    // The seven formats, as the encoding converters name them.
    QList<QPair<unsigned int, QString>> formats;
    ASSERT_EQ(resources.GetFormats(formats), 7u);
    for (int i = 0; i < 7; ++i) {
        EXPECT_EQ(formats[i].first, unsigned(i));
        EXPECT_EQ(formats[i].second, QEncoding::Format2Name(static_cast<KestoEncodingFormat>(i)));
    }
    EXPECT_EQ(resources.GetFormatName(6), u"UTF-8"_s);
    EXPECT_TRUE(resources.GetFormatName(7).isEmpty());
}

TEST(KestoResources, StoresStringsWithTheirMark)
{
    using Getter = QString (KestoResources::*)();
    const struct
    {
        quint16 id, format;
        QString text;
        const char *block;
        Getter getter;
    } rows[] = {{6, 0, u"AB"_s, "FFFE41004200", &KestoResources::GetCompanyName},
                {8, 6, u"1.0"_s, "02312E30", &KestoResources::GetApplicationVersion},
                {7, 1, u"\u00a9 K"_s, "03A9204B", &KestoResources::GetCopyright}};
    KestoResources resources;
    for (const auto &row : rows) {
        ASSERT_TRUE(resources.AddString(1, row.id, row.format, row.text));
        QByteArray block;
        ASSERT_TRUE(resources.GetBinary(1, row.id, block));
        EXPECT_EQ(block, Hex(row.block));
        EXPECT_EQ((resources.*row.getter)(), row.text);
        EXPECT_EQ((KestoResources().*row.getter)(), QString());
    }

    // No converter for the format: an empty block, which reads as absent.
    ASSERT_TRUE(resources.AddString(1, 9, 999, u"x"_s));
    QByteArray block;
    EXPECT_FALSE(resources.GetBinary(1, 9, block));
    quint16 format = 42;
    QString text = u"untouched"_s;
    EXPECT_FALSE(resources.GetString(1, 9, &format, text));
    EXPECT_FALSE(resources.GetString(1, 99, &format, text));
    EXPECT_EQ(format, 42);
    EXPECT_EQ(text, u"untouched"_s);
    EXPECT_TRUE(resources.LastError().isEmpty());
}

struct StringCase
{
    quint16 format;
    const char16_t *text;
    // iconv's name for the format, when the text as iconv encodes it is read too.
    const char *charset = nullptr;
};

class KestoString : public ::testing::TestWithParam<StringCase>
{
};

// A string read back is the string that was stored, in every format: the mark is not decoded as text and the last
// character is not lost. Text encoded by iconv, not by our converters, reads back too.
TEST_P(KestoString, ReadsBackTheStoredText)
{
    const StringCase &c = GetParam();
    const QString text = QString::fromUtf16(c.text);
    KestoResources resources;
    ASSERT_TRUE(resources.AddString(1, 3, c.format, text));
    KestoResources loaded;
    QByteArray file;
    ASSERT_TRUE(resources.SaveTo(file));
    ASSERT_TRUE(loaded.LoadFrom(file));
    quint16 format = 99;
    QString back;
    ASSERT_TRUE(loaded.GetString(1, 3, &format, back));
    EXPECT_EQ(back, text);
    // KS C 5601 and CP949 share their mark, which reads as CP949.
    EXPECT_EQ(format, c.format == 2 ? 5 : c.format);

    if (!c.charset || !testutil::HaveProgram(u"iconv"_s))
        return;
    QTemporaryDir dir;
    testutil::WriteFile(dir.filePath("in.txt"), text.toUtf8());
    QByteArray encoded;
    const QStringList arguments{u"-f"_s, u"UTF-8"_s, u"-t"_s, QString::fromLatin1(c.charset), dir.filePath("in.txt")};
    ASSERT_EQ(testutil::RunProgram(u"iconv"_s, arguments, &encoded), 0);
    resources.AddBinary(1, 1, QEncoding::GetBOM(static_cast<KestoEncodingFormat>(c.format)) + encoded);
    back.clear();
    ASSERT_TRUE(resources.GetString(1, 1, &format, back));
    EXPECT_EQ(back, text);
}

INSTANTIATE_TEST_SUITE_P(
    KestoResources, KestoString,
    ::testing::Values(StringCase{0, u"AB"}, StringCase{0, u"A"},
                      StringCase{0, u"\u00dcn\u00ef \U0001D11E \U0001F600", "UTF-16LE"}, StringCase{0, u""},
                      StringCase{1, u"A"}, StringCase{1, u"caf\u00e9 Gr\u00fc\u00dfe", "ISO-8859-1"},
                      StringCase{1, u"\u0003lead"}, StringCase{6, u"A"}, StringCase{6, u"AB"},
                      StringCase{6, u"h\u00e9llo \u20ac", "UTF-8"}, StringCase{6, u"\u65e5"}, StringCase{2, u"A"},
                      StringCase{2, u"\ud55c\uae00 \uad6d\uc5b4 AB", "EUC-KR"}, StringCase{3, u"A"},
                      StringCase{3, u"\u65e5\u672c\u8a9e AB", "SHIFT_JIS"}, StringCase{4, u"A"},
                      StringCase{4, u"\u4e2d\u6587 AB", "GB2312"}, StringCase{5, u"A"},
                      StringCase{5, u"\ud55c\uae00 \uad6d\uc5b4 AB", "CP949"}));

TEST(KestoResources, MimeObjectsReadBackAndCorruptBlocksAreRefused)
{
    KestoResources resources;
    ASSERT_TRUE(resources.AddMimeObject(6, 1, u"image/png"_s, Hex("89504E47")));
    QByteArray block;
    resources.GetBinary(6, 1, block);
    EXPECT_EQ(block, QByteArray("\x0a\x00image/png\x00\x00", 13) + Hex("89504E47"));
    QString mimeType;
    QByteArray data;
    ASSERT_TRUE(resources.GetMimeObject(6, 1, mimeType, data));
    EXPECT_EQ(mimeType, u"image/png"_s);
    EXPECT_EQ(data, Hex("89504E47"));

    const QString longest(128, u'm');
    EXPECT_TRUE(resources.AddMimeObject(6, 2, longest, QByteArray()));
    ASSERT_TRUE(resources.GetMimeObject(6, 2, mimeType, data));
    EXPECT_EQ(mimeType, longest);
    EXPECT_TRUE(data.isEmpty());
    EXPECT_FALSE(resources.AddMimeObject(6, 3, longest + u'm', "x"));
    EXPECT_FALSE(resources.GetBinary(6, 3, block));

    // A count byte larger than the block, and blocks too short to hold one.
    for (const QByteArray &corrupt : {Hex("FF00616263"), Hex("05"), Hex("0300616200")}) {
        resources.AddBinary(6, 4, corrupt);
        mimeType = u"kept"_s;
        EXPECT_FALSE(resources.GetMimeObject(6, 4, mimeType, data)) << corrupt.toHex().constData();
        EXPECT_EQ(mimeType, u"kept"_s);
    }
    EXPECT_FALSE(resources.GetMimeObject(6, 99, mimeType, data));
}

// Empty blocks read as absent; the header is reported; copies own their stream.
TEST(KestoResources, BinariesHeaderAndCopies)
{
    KestoResources resources;
    ASSERT_TRUE(resources.AddBinary(0x5000, 9, Hex("0102")));
    ASSERT_TRUE(resources.AddBinary(0x5000, 10, QByteArray()));
    QByteArray data;
    EXPECT_TRUE(resources.GetBinary(0x5000, 9, data));
    EXPECT_EQ(data, Hex("0102"));
    EXPECT_FALSE(resources.GetBinary(0x5000, 10, data));
    EXPECT_FALSE(resources.GetBinary(0x5000, 11, data));
    EXPECT_TRUE(data.isNull());
    QVector<quint16> ids;
    EXPECT_EQ(resources.GetIDs(0x5000, ids), 2u);
    resources.Clear(0x5000, 9);
    EXPECT_EQ(resources.GetIDs(0x5000, ids), 1u);
    resources.ClearAll();
    QVector<quint16> types;
    EXPECT_EQ(resources.GetResourceTypes(types), 0u);
    EXPECT_TRUE(resources.LastError().isEmpty());

    resources.AddBinary(1, 1, "hello");
    QTemporaryDir dir;
    ASSERT_TRUE(resources.Write(dir.filePath("a.kar")));
    quint8 fileType = 0;
    quint16 version = 0, oldest = 0, mapEntries = 0;
    quint32 offsetToMap = 0, lengthOfMap = 0, offsetToEntries = 0, count = 0, offsetToResources = 0, length = 0;
    ASSERT_TRUE(resources.ResourceHeader(fileType, version, oldest, mapEntries, offsetToMap, lengthOfMap,
                                         offsetToEntries, count, offsetToResources, length));
    EXPECT_EQ(std::tie(fileType, mapEntries, offsetToEntries, offsetToResources, length),
              std::make_tuple(quint8(17), quint16(1), 40u, 48u, 5u));
    EXPECT_TRUE(resources.Dump().startsWith(u"=== Header ===\n"_s));

    KestoResources copy(resources);
    copy.AddBinary(1, 2, "x");
    EXPECT_FALSE(resources.GetBinary(1, 2, data));
    KestoResources assigned;
    assigned = copy;
    copy.ClearAll();
    EXPECT_TRUE(assigned.GetBinary(1, 2, data));

    KestoResources read;
    ASSERT_TRUE(read.Read(dir.filePath("a.kar")));
    EXPECT_TRUE(read.GetBinary(1, 1, data));
    EXPECT_FALSE(read.Read(dir.filePath("missing.kar")));
}

} // namespace
