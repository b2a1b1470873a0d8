#include "encodingtest.h"

#include <gtest/gtest.h>

#include <cstring>

using namespace Qt::StringLiterals;

namespace {

using namespace encodingtest;

TEST(EncodingFormats, NamesMarksAndSizes)
{
    for (const char *name : {"", "none", "UTF8"})
        EXPECT_EQ(QEncoding::Name2Format(name), ENCODING_NONE) << name;
    EXPECT_EQ(QEncoding::Format2Name(static_cast<KestoEncodingFormat>(7)), QString());
    EXPECT_EQ(QEncoding::Format2Name(ENCODING_NONE), "None");

    QList<KestoEncodingFormat> formats{ENCODING_NONE};
    ASSERT_EQ(QEncoding::EncodingFormats(formats), 7u);
    const char *names[] = {"Unicode", "ISOLATIN1", "KSC5601", "S-JIS", "GB2312", "CP949", "UTF-8"};
    const char *marks[] = {"FFFE", "03", "FEFE", "FDFE", "FCFE", "FEFE", "02"};
    for (int i = 0; i < 7; ++i) {
        EXPECT_EQ(formats[i], i);
        EXPECT_EQ(QEncoding::Format2Name(formats[i]), QString::fromLatin1(names[i]));
        EXPECT_EQ(QEncoding::Name2Format(QString::fromLatin1(names[i]).toLower()), formats[i]);
        EXPECT_EQ(QEncoding::GetBOM(formats[i]), QByteArray::fromHex(marks[i])) << i;
        EXPECT_EQ(QEncoding::BOMSize(formats[i]), std::strlen(marks[i]) / 2) << i;
    }
    for (int other : {7, 999, -1, 1000}) {
        const auto format = static_cast<KestoEncodingFormat>(other);
        EXPECT_EQ(QEncoding::GetBOM(format), Bytes({0xFF, 0xFE})) << other;
        EXPECT_EQ(QEncoding::BOMSize(format), 0u) << other;
    }
}

struct Detection
{
    QByteArray data;
    KestoEncodingFormat format;
    bool result, hasEncoder;
};

class DetectFormat : public ::testing::TestWithParam<Detection>
{
};

TEST_P(DetectFormat, FromLeadingMark)
{
    const Detection &d = GetParam();
    QEncoding *encoder = nullptr;
    CreateEncoder(ENCODING_UTF8, &encoder); // a held converter is released first
    // No format, yet a value the enumeration can hold: what a block without a mark leaves alone.
    KestoEncodingFormat format = static_cast<KestoEncodingFormat>(1000);
    EXPECT_EQ(CreateEncoder(d.data, &encoder, format), d.result);
    EXPECT_EQ(format, d.format);
    EXPECT_EQ(encoder != nullptr, d.hasEncoder);
    FreeEncoder(encoder);
}

INSTANTIATE_TEST_SUITE_P(Marks, DetectFormat,
                         ::testing::Values(Detection{Bytes({0x03}), ENCODING_ISOLATIN1, true, true},
                                           Detection{Bytes({0x02}), ENCODING_UTF8, true, true},
                                           Detection{Bytes({0x41}), ENCODING_NONE, false, false},
                                           Detection{Bytes({0xFE}), ENCODING_NONE, false, false},
                                           Detection{Bytes({0xFF, 0xFE}), ENCODING_UNICODE, true, false},
                                           Detection{Bytes({0x03, 0x41}), ENCODING_ISOLATIN1, true, true},
                                           Detection{Bytes({0x02, 0x41}), ENCODING_UTF8, true, true},
                                           Detection{Bytes({0xFE, 0xFE, 0x41}), ENCODING_CP949, true, true},
                                           Detection{Bytes({0xFE, 0xFE}), ENCODING_CP949, true, true},
                                           Detection{Bytes({0xFD, 0xFE}), ENCODING_SJIS, true, true},
                                           Detection{Bytes({0xFC, 0xFE, 0xB0, 0xA1}), ENCODING_GB2312, true, true},
                                           Detection{Bytes({0xFF, 0xFE, 0x41, 0x00}), ENCODING_UNICODE, true, false},
                                           Detection{Bytes({0xFE, 0xFF}), ENCODING_NONE, false, false},
                                           Detection{Bytes({0xFB, 0xFE}), ENCODING_NONE, false, false},
                                           Detection{Bytes({0x41, 0x42}), ENCODING_NONE, false, false},
                                           // An empty block leaves the format as it was.
                                           Detection{QByteArray(), KestoEncodingFormat(1000), false, false}));

// Each converter created for a format is the one detection picks for its mark (KSC5601, which shares CP949's mark,
// decodes as CP949). There is no converter for Unicode, None or an unknown format.
TEST(CreateEncoder, MarkOfEachFormatSelectsAConverterThatReadsIt)
{
    const QString text = u"Ab1"_s;
    for (int value = 1; value <= 6; ++value) {
        const auto format = static_cast<KestoEncodingFormat>(value);
        EncoderPtr writer = Make(format);
        ASSERT_TRUE(writer) << value;
        QByteArray body;
        writer->FromUnicode(text, body);
        QEncoding *reader = nullptr;
        KestoEncodingFormat detected = ENCODING_NONE;
        ASSERT_TRUE(CreateEncoder(QEncoding::GetBOM(format) + body, &reader, detected)) << value;
        EXPECT_EQ(detected, format == ENCODING_KSC5601 ? ENCODING_CP949 : format);
        QString decoded;
        reader->ToUnicode(body, decoded);
        EXPECT_EQ(decoded, text) << value;
        EXPECT_EQ(reader->MinCharSize(), 1u);
        FreeEncoder(reader);
    }
    for (int value : {0, 7, 999, -5}) {
        QEncoding *encoder = nullptr;
        CreateEncoder(ENCODING_UTF8, &encoder);
        EXPECT_FALSE(CreateEncoder(static_cast<KestoEncodingFormat>(value), &encoder)) << value;
        EXPECT_EQ(encoder, nullptr) << value;
    }
    FreeEncoder(nullptr);
}

// Bytes and text that a converter turns into each other. Encoding replaces what the output held; decoding replaces it
// too in UTF-8 and appends to it in the other converters.
enum Ways { kDecodes = 1, kEncodes = 2, kBoth = 3 };

struct Conversion
{
    const char *what;
    KestoEncodingFormat format;
    int ways;
    QByteArray bytes;
    QString text;
};

const Conversion kConversions[] = {
    {"UTF-8 keeps the last character of a block without a NUL", ENCODING_UTF8, kDecodes, "1.0", u"1.0"_s},
    {"UTF-8 single character", ENCODING_UTF8, kDecodes, "A", u"A"_s},
    {"UTF-8 control", ENCODING_UTF8, kDecodes, Bytes({0x02, '1'}), Units({0x02, '1'})},
    {"UTF-8 two bytes", ENCODING_UTF8, kBoth, Bytes({'a', 0xC3, 0xA9}), Units({'a', 0xE9})},
    {"UTF-8 four bytes", ENCODING_UTF8, kDecodes, Bytes({0xF0, 0x9F, 0x98, 0x80}), Units({0xD83D, 0xDE00})},
    {"UTF-8 U+FFFF, U+10000", ENCODING_UTF8, kDecodes, QByteArray::fromHex("EFBFBF F0908080"), u"\uFFFF\U00010000"_s},
    {"UTF-8 overlong", ENCODING_UTF8, kDecodes, Bytes({0xF0, 0x8F, 0xBF, 0xBF}), u"\uFFFD\uFFFD\uFFFD\uFFFD"_s},
    {"UTF-8 a sequence per surrogate", ENCODING_UTF8, kBoth, QByteArray::fromHex("EDA0BD EDB880"), u"\U0001F600"_s},
    {"UTF-8 stops at NUL", ENCODING_UTF8, kDecodes, Bytes({'a', 0, 'b'}), u"a"_s},
    {"UTF-8 NUL adds nothing", ENCODING_UTF8, kEncodes, QByteArray::fromHex("4142 DFBF E0A080"),
     Units({'A', 0, 'B', 0x7FF, 0x800})},
    {"UTF-8 cut sequence at the end", ENCODING_UTF8, kDecodes, Bytes({'a', 0xE2, 0x82}), u"a"_s},
    {"UTF-8 cut sequence before NUL", ENCODING_UTF8, kDecodes, Bytes({'a', 0xE2, 0, 'b'}), u"a"_s},
    {"UTF-8 stray bytes", ENCODING_UTF8, kDecodes, Bytes({0x80, 'a', 0xFF}), Units({0xFFFD, 'a', 0xFFFD})},
    {"UTF-8 lead without trail", ENCODING_UTF8, kDecodes, Bytes({0xC3, 'a'}), Units({0xFFFD, 'a'})},
    {"UTF-8 past U+10FFFF", ENCODING_UTF8, kDecodes, Bytes({0xF4, 0x90, 0x80, 0x80}), u"\uFFFD\uFFFD\uFFFD\uFFFD"_s},
    {"UTF-8 empty", ENCODING_UTF8, kBoth, QByteArray(), QString()},
    {"Latin-1 keeps the low byte", ENCODING_ISOLATIN1, kEncodes, Bytes({0x41, 0xE9}), Units({0x0141, 0xE9})},
    {"Latin-1 skips a leading mark", ENCODING_ISOLATIN1, kDecodes, Bytes({0x03, 0xE9}), Units({0xE9})},
    {"Latin-1 keeps a later mark", ENCODING_ISOLATIN1, kDecodes, Bytes({'a', 0x03, 'b', 0, 'c'}), u"a\u0003b"_s},
    {"GB2312 pair then ASCII", ENCODING_GB2312, kBoth, Bytes({0xA1, 0xA1, 0x41}), Units({0x3000, 'A'})},
    {"GB2312 mark is decoded too", ENCODING_GB2312, kDecodes, Bytes({0xFC, 0xFE, 0xB0, 0xA1}), u"??\u554A"_s},
    {"GB2312 lead takes an ASCII trail", ENCODING_GB2312, kDecodes, Bytes({0xA1, 0x41, 0x42}), Units({'?', 'B'})},
    {"GB2312 lone lead at the end", ENCODING_GB2312, kDecodes, Bytes({0x41, 0xB0}), Units({'A', '?'})},
    {"GB2312 stops at NUL", ENCODING_GB2312, kDecodes, Bytes({0x41, 0x00, 0x42}), Units({'A'})},
    {"GB2312 byte 80", ENCODING_GB2312, kDecodes, Bytes({0x80, 0x41}), Units({'?', 'A'})},
    {"GB2312 NUL adds nothing", ENCODING_GB2312, kEncodes, "AB", Units({'A', 0, 'B'})},
    {"GB2312 unmapped", ENCODING_GB2312, kEncodes, "??", Units({0xAC00, 0xD800})},
    {"S-JIS ASCII and katakana", ENCODING_SJIS, kBoth, Bytes({0x5C, 0x7E, 0xA1, 0xDF}), u"\\~\uFF61\uFF9F"_s},
    {"S-JIS kanji and kana", ENCODING_SJIS, kDecodes, Bytes({0x88, 0x9F, 0x82, 0xA0}), Units({0x4E9C, 0x3042})},
    {"S-JIS user area skips 7F", ENCODING_SJIS, kBoth, QByteArray::fromHex("F040 F07E F080 F9FC"),
     u"\uE000\uE03E\uE03F\uE757"_s},
    {"S-JIS user area has no 7F trail", ENCODING_SJIS, kDecodes, Bytes({0xF0, 0x7F}), Units({'?'})},
    {"S-JIS user area end", ENCODING_SJIS, kEncodes, Bytes({0xF9, 0xFC, '?'}), Units({0xE757, 0xE758})},
    {"S-JIS lone lead at the end", ENCODING_SJIS, kDecodes, Bytes({0x41, 0x81}), Units({'A', '?'})},
    {"S-JIS unassigned bytes", ENCODING_SJIS, kDecodes, Bytes({0x80, 0xA0, 0xFD}), Units({'?', '?', '?'})},
    {"S-JIS yen sign is not ASCII", ENCODING_SJIS, kEncodes, "?", Units({0xA5})},
    {"KSC5601 Hangul", ENCODING_KSC5601, kBoth, Bytes({0xB0, 0xA1, 0x41}), Units({0xAC00, 'A'})},
    {"KSC5601 mark is unmapped", ENCODING_KSC5601, kDecodes, Bytes({0xFE, 0xFE, 0x41}), Units({' ', 'A'})},
    {"KSC5601 has no extension", ENCODING_KSC5601, kDecodes, Bytes({0x81, 0x41}), Units({' '})},
    {"KSC5601 has no extension", ENCODING_KSC5601, kEncodes, "??", Units({0xAC02, 0xE9})},
    {"KSC5601 lead before NUL", ENCODING_KSC5601, kDecodes, Bytes({0x41, 0xB0, 0x00, 0xA1}), Units({'A', ' '})},
    {"KSC5601 lone lead at the end", ENCODING_KSC5601, kDecodes, Bytes({0xB0}), Units({' '})},
    {"KSC5601 controls pass", ENCODING_KSC5601, kDecodes, Bytes({0x01, 0x7F}), Units({0x01, 0x7F})},
    {"CP949 extension", ENCODING_CP949, kBoth, Bytes({0x81, 0x41, 0xB0, 0xA1}), Units({0xAC02, 0xAC00})},
    {"CP949 unmapped", ENCODING_CP949, kDecodes, Bytes({0xC9, 0xA1, 0x80, 0x41}), Units({' ', ' '})},
    {"CP949 unmapped", ENCODING_CP949, kEncodes, "?z", Units({0xE000, 'z'})},
    {"CP949 stops at NUL", ENCODING_CP949, kDecodes, Bytes({0x41, 0x00, 0x42}), Units({'A'})}};

class Converts : public ::testing::TestWithParam<Conversion>
{
};

TEST_P(Converts, BytesToTextAndBack)
{
    const Conversion &c = GetParam();
    EncoderPtr encoding = Make(c.format);
    if (c.ways & kDecodes) {
        QString out = u"x"_s;
        const int length = encoding->ToUnicode(c.bytes, out);
        EXPECT_EQ(length, out.size()) << c.what;
        EXPECT_EQ(out, (c.format == ENCODING_UTF8 ? QString() : u"x"_s) + c.text) << c.what;
    }
    if (c.ways & kEncodes) {
        QByteArray out("stale");
        EXPECT_EQ(encoding->FromUnicode(c.text, out), unsigned(c.bytes.size())) << c.what;
        EXPECT_EQ(out, c.bytes) << c.what;
    }
}

INSTANTIATE_TEST_SUITE_P(Converters, Converts, ::testing::ValuesIn(kConversions));

TEST(UnicodeToChar, WritesOneCodeOrRefuses)
{
    char bytes[QEncoding::kMaxEncodedSize] = {'x', 'x', 'x', 'x', 'x'};
    EXPECT_FALSE(Make(ENCODING_CP949)->UnicodeToChar(0xE000, bytes));
    EXPECT_EQ(QByteArray(bytes), " ");
    EncoderPtr utf8 = Make(ENCODING_UTF8);
    for (const auto &[unit, hex] :
         {std::pair<unsigned int, const char *>{0x1F600, "f09f9880"}, {0x10FFFF, "f48fbfbf"}}) {
        ASSERT_TRUE(utf8->UnicodeToChar(unit, bytes));
        EXPECT_EQ(QByteArray(bytes).toHex(), hex);
    }
    EXPECT_FALSE(utf8->UnicodeToChar(0x110000, bytes));
}

} // namespace
