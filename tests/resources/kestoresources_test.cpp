#include "resources/kestoresources.h"

#include "bytes.h"
#include "encoding/qencoding.h"
#include "support/testutil.h"

#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

using resourcebytes::Hex;

bool HasConverter(quint16 format)
{
    if (format == 0)
        return true;
    QEncoding *encoder = nullptr;
    const bool created = CreateEncoder(static_cast<KestoEncodingFormat>(format), &encoder);
    FreeEncoder(encoder);
    return created;
}

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
        EXPECT_EQ(resources.GetResourceTypeName(type), QLatin1String(name));

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
    KestoResources resources;
    ASSERT_TRUE(resources.AddString(1, 6, 0, u"AB"_s));
    QByteArray block;
    ASSERT_TRUE(resources.GetBinary(1, 6, block));
    EXPECT_EQ(block, Hex("FFFE41004200"));
    EXPECT_EQ(resources.GetCompanyName(), u"AB"_s);

    ASSERT_TRUE(resources.AddString(1, 8, 6, u"1.0"_s));
    ASSERT_TRUE(resources.GetBinary(1, 8, block));
    EXPECT_EQ(block, Hex("02312E30"));
    quint16 format = 99;
    QString text;
    ASSERT_TRUE(resources.GetString(1, 8, &format, text));
    EXPECT_EQ(format, 6);
    EXPECT_EQ(text, u"1.0"_s);
    EXPECT_EQ(resources.GetApplicationVersion(), u"1.0"_s);

    ASSERT_TRUE(resources.AddString(1, 7, 1, u"\u00a9 K"_s));
    ASSERT_TRUE(resources.GetBinary(1, 7, block));
    EXPECT_EQ(block, Hex("03A9204B"));
    EXPECT_EQ(resources.GetCopyright(), u"\u00a9 K"_s);

    // No converter for the format: an empty block, which reads as absent.
    ASSERT_TRUE(resources.AddString(1, 9, 999, u"x"_s));
    EXPECT_FALSE(resources.GetBinary(1, 9, block));
    format = 42;
    text = u"untouched"_s;
    EXPECT_FALSE(resources.GetString(1, 9, &format, text));
    EXPECT_FALSE(resources.GetString(1, 99, &format, text));
    EXPECT_EQ(format, 42);
    EXPECT_EQ(text, u"untouched"_s);
    EXPECT_TRUE(KestoResources().GetCompanyName().isEmpty());
    EXPECT_TRUE(resources.LastError().isEmpty());
}

struct StringCase
{
    quint16 format;
    const char16_t *text;
};

class KestoStringRoundTrip : public ::testing::TestWithParam<StringCase>
{
};

// A string read back is the string that was stored, in every format: the mark
// is not decoded as text and the last character is not lost.
TEST_P(KestoStringRoundTrip, ReadsBackTheStoredText)
{
    const StringCase &c = GetParam();
    ASSERT_TRUE(HasConverter(c.format)) << "no converter for format " << c.format;
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
}

INSTANTIATE_TEST_SUITE_P(KestoResources, KestoStringRoundTrip,
                         ::testing::Values(StringCase{0, u"AB"}, StringCase{0, u"A"},
                                           StringCase{0, u"\u00dcn\u00ef \U0001D11E"}, StringCase{0, u""},
                                           StringCase{1, u"A"}, StringCase{1, u"caf\u00e9"},
                                           StringCase{1, u"\u0003lead"}, StringCase{6, u"A"}, StringCase{6, u"AB"},
                                           StringCase{6, u"h\u00e9llo \u20ac"}, StringCase{6, u"\u65e5"},
                                           StringCase{2, u"A"}, StringCase{2, u"\ud55c\uae00 AB"}, StringCase{3, u"A"},
                                           StringCase{3, u"\u65e5\u672c AB"}, StringCase{4, u"A"},
                                           StringCase{4, u"\u4e2d\u6587 AB"}, StringCase{5, u"A"},
                                           StringCase{5, u"\ud55c\uae00 AB"}));

struct IconvCase
{
    quint16 format;
    const char *charset;
    const char16_t *text;
};

class KestoStringFromIconv : public ::testing::TestWithParam<IconvCase>
{
};

// Blocks whose text was encoded by iconv, not by our converters.
TEST_P(KestoStringFromIconv, DecodesTextEncodedElsewhere)
{
    const IconvCase &c = GetParam();
    ASSERT_TRUE(HasConverter(c.format)) << "no converter for format " << c.format;
    if (!testutil::HaveProgram(u"iconv"_s))
        GTEST_SKIP() << "iconv is not installed";
    const QString text = QString::fromUtf16(c.text);
    QTemporaryDir dir;
    testutil::WriteFile(dir.filePath("in.txt"), text.toUtf8());
    QByteArray encoded;
    ASSERT_EQ(testutil::RunProgram(u"iconv"_s,
                                   {u"-f"_s, u"UTF-8"_s, u"-t"_s, QLatin1String(c.charset), dir.filePath("in.txt")},
                                   &encoded),
              0);
    KestoResources resources;
    resources.AddBinary(1, 1, QEncoding::GetBOM(static_cast<KestoEncodingFormat>(c.format)) + encoded);
    QString back;
    quint16 format = 0;
    ASSERT_TRUE(resources.GetString(1, 1, &format, back));
    EXPECT_EQ(back, text);
}

INSTANTIATE_TEST_SUITE_P(KestoResources, KestoStringFromIconv,
                         ::testing::Values(IconvCase{0, "UTF-16LE", u"Gr\u00fc\u00dfe \U0001F600"},
                                           IconvCase{1, "ISO-8859-1", u"Gr\u00fc\u00dfe"},
                                           IconvCase{6, "UTF-8", u"Gr\u00fc\u00dfe \u20ac"},
                                           IconvCase{5, "CP949", u"\ud55c\uad6d\uc5b4 text"},
                                           IconvCase{2, "EUC-KR", u"\ud55c\uad6d\uc5b4 text"},
                                           IconvCase{3, "SHIFT_JIS", u"\u65e5\u672c\u8a9e text"},
                                           IconvCase{4, "GB2312", u"\u4e2d\u6587 text"}));

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

    const QString longest(128, QLatin1Char('m'));
    EXPECT_TRUE(resources.AddMimeObject(6, 2, longest, QByteArray()));
    ASSERT_TRUE(resources.GetMimeObject(6, 2, mimeType, data));
    EXPECT_EQ(mimeType, longest);
    EXPECT_TRUE(data.isEmpty());
    EXPECT_FALSE(resources.AddMimeObject(6, 3, longest + QLatin1Char('m'), "x"));
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

TEST(KestoResources, BinariesAndEmptyBlocks)
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
}

TEST(KestoResources, ReportsTheHeaderAndCopiesOwnTheirStream)
{
    KestoResources resources;
    resources.AddBinary(1, 1, "hello");
    QTemporaryDir dir;
    ASSERT_TRUE(resources.Write(dir.filePath("a.kar")));
    quint8 fileType = 0;
    quint16 version = 0, oldest = 0, mapEntries = 0;
    quint32 offsetToMap = 0, lengthOfMap = 0, offsetToEntries = 0, count = 0, offsetToResources = 0, length = 0;
    ASSERT_TRUE(resources.ResourceHeader(fileType, version, oldest, mapEntries, offsetToMap, lengthOfMap,
                                         offsetToEntries, count, offsetToResources, length));
    EXPECT_EQ(fileType, 17);
    EXPECT_EQ(mapEntries, 1);
    EXPECT_EQ(offsetToEntries, 40u);
    EXPECT_EQ(offsetToResources, 48u);
    EXPECT_EQ(length, 5u);
    EXPECT_TRUE(resources.Dump().startsWith(u"=== Header ===\n"_s));

    KestoResources copy(resources);
    copy.AddBinary(1, 2, "x");
    QByteArray data;
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
