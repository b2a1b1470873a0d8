#include "encodingtest.h"

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

using namespace encodingtest;

TEST(EncodingFormats, NamesMarksAndSizes)
{
    EXPECT_EQ(QEncoding::Name2Format("utf-8"), ENCODING_UTF8);
    EXPECT_EQ(QEncoding::Name2Format("s-jis"), ENCODING_SJIS);
    EXPECT_EQ(QEncoding::Name2Format(""), ENCODING_NONE);
    EXPECT_EQ(QEncoding::Name2Format("none"), ENCODING_NONE);
    EXPECT_EQ(QEncoding::Name2Format("UTF8"), ENCODING_NONE);
    EXPECT_EQ(QEncoding::Format2Name(static_cast<KestoEncodingFormat>(7)), QString());
    EXPECT_EQ(QEncoding::Format2Name(ENCODING_NONE), "None");

    QList<KestoEncodingFormat> formats{ENCODING_NONE};
    ASSERT_EQ(QEncoding::EncodingFormats(formats), 7u);
    const QStringList names{"Unicode", "ISOLATIN1", "KSC5601", "S-JIS", "GB2312", "CP949", "UTF-8"};
    for (int i = 0; i < 7; ++i) {
        EXPECT_EQ(formats[i], i);
        EXPECT_EQ(QEncoding::Format2Name(formats[i]), names[i]);
        EXPECT_EQ(QEncoding::Name2Format(names[i].toLower()), formats[i]);
    }

    const QList<QByteArray> marks{Bytes({0xFF, 0xFE}), Bytes({0x03}),       Bytes({0xFE, 0xFE}), Bytes({0xFD, 0xFE}),
                                  Bytes({0xFC, 0xFE}), Bytes({0xFE, 0xFE}), Bytes({0x02})};
    for (int i = 0; i < 7; ++i) {
        const auto format = static_cast<KestoEncodingFormat>(i);
        EXPECT_EQ(QEncoding::GetBOM(format), marks[i]) << i;
        EXPECT_EQ(QEncoding::BOMSize(format), unsigned(marks[i].size())) << i;
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
    bool result;
    bool hasEncoder;
};

class DetectFormat : public ::testing::TestWithParam<Detection>
{
};

TEST_P(DetectFormat, FromLeadingMark)
{
    const Detection &d = GetParam();
    QEncoding *encoder = nullptr;
    CreateEncoder(ENCODING_UTF8, &encoder); // a held converter is released first
    KestoEncodingFormat format = static_cast<KestoEncodingFormat>(12345);
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
                                           Detection{QByteArray(), KestoEncodingFormat(12345), false, false}));

TEST(CreateEncoder, NoConverterForUnicodeNoneOrUnknown)
{
    for (int value : {0, 7, 999, -5}) {
        QEncoding *encoder = nullptr;
        CreateEncoder(ENCODING_UTF8, &encoder);
        EXPECT_FALSE(CreateEncoder(static_cast<KestoEncodingFormat>(value), &encoder)) << value;
        EXPECT_EQ(encoder, nullptr) << value;
    }
    FreeEncoder(nullptr);
}

// Each converter created for a format is the one detection picks for its
// mark (KSC5601, which shares CP949's mark, decodes as CP949).
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
}

TEST(Utf8, EncodesUnitByUnit)
{
    EncoderPtr utf8 = Make(ENCODING_UTF8);
    ASSERT_TRUE(utf8);
    QByteArray out("stale");
    EXPECT_EQ(utf8->FromUnicode(Units({0x00E9}), out), 2u);
    EXPECT_EQ(out, Bytes({0xC3, 0xA9}));
    // U+1F600 held as a surrogate pair: one three-byte sequence per unit.
    utf8->FromUnicode(Units({0xD83D, 0xDE00}), out);
    EXPECT_EQ(out, Bytes({0xED, 0xA0, 0xBD, 0xED, 0xB8, 0x80}));
    utf8->FromUnicode(Units({'A', 0, 'B', 0x7FF, 0x800}), out);
    EXPECT_EQ(out, Bytes({'A', 'B', 0xDF, 0xBF, 0xE0, 0xA0, 0x80}));

    char bytes[QEncoding::kMaxEncodedSize];
    ASSERT_TRUE(utf8->UnicodeToChar(0x10FFFF, bytes));
    EXPECT_EQ(QByteArray(bytes), Bytes({0xF4, 0x8F, 0xBF, 0xBF}));
    EXPECT_FALSE(utf8->UnicodeToChar(0x110000, bytes));
}

struct Utf8Decode
{
    QByteArray in;
    QString out;
};

class Utf8Decoding : public ::testing::TestWithParam<Utf8Decode>
{
};

TEST_P(Utf8Decoding, ReplacesOutput)
{
    EncoderPtr utf8 = Make(ENCODING_UTF8);
    QString out("stale");
    EXPECT_EQ(utf8->ToUnicode(GetParam().in, out), GetParam().out.size());
    EXPECT_EQ(out, GetParam().out);
}

INSTANTIATE_TEST_SUITE_P(
    Blocks, Utf8Decoding,
    ::testing::Values(
        // The last character of a block without a NUL is kept.
        Utf8Decode{"1.0", "1.0"}, Utf8Decode{"A", "A"}, Utf8Decode{Bytes({0x02, '1'}), Units({0x02, '1'})},
        Utf8Decode{Bytes({'a', 0xC3, 0xA9}), Units({'a', 0xE9})},
        Utf8Decode{Bytes({0xF0, 0x9F, 0x98, 0x80}), Units({0xD83D, 0xDE00})},
        // U+FFFF is the last three-byte character, U+10000 the first four-byte one.
        Utf8Decode{Bytes({0xEF, 0xBF, 0xBF, 0xF0, 0x90, 0x80, 0x80}), Units({0xFFFF, 0xD800, 0xDC00})},
        Utf8Decode{Bytes({0xF0, 0x8F, 0xBF, 0xBF}), Units({0xFFFD, 0xFFFD, 0xFFFD, 0xFFFD})},
        Utf8Decode{Bytes({0xED, 0xA0, 0xBD, 0xED, 0xB8, 0x80}), Units({0xD83D, 0xDE00})},
        Utf8Decode{Bytes({'a', 0, 'b'}), "a"}, Utf8Decode{Bytes({'a', 0xE2, 0x82}), "a"},
        Utf8Decode{Bytes({'a', 0xE2, 0, 'b'}), "a"}, Utf8Decode{Bytes({0x80, 'a', 0xFF}), Units({0xFFFD, 'a', 0xFFFD})},
        Utf8Decode{Bytes({0xC3, 'a'}), Units({0xFFFD, 'a'})},
        Utf8Decode{Bytes({0xF4, 0x90, 0x80, 0x80}), Units({0xFFFD, 0xFFFD, 0xFFFD, 0xFFFD})},
        Utf8Decode{QByteArray(), QString()}));

TEST(IsoLatin1, SkipsMarkKeepsLowByte)
{
    EncoderPtr latin1 = Make(ENCODING_ISOLATIN1);
    ASSERT_TRUE(latin1);
    QByteArray out;
    EXPECT_EQ(latin1->FromUnicode(Units({0x0141, 0xE9}), out), 2u);
    EXPECT_EQ(out, Bytes({0x41, 0xE9}));

    QString text("x");
    EXPECT_EQ(latin1->ToUnicode(Bytes({0x03, 0xE9}), text), 2);
    EXPECT_EQ(text, Units({'x', 0xE9}));
    text.clear();
    latin1->ToUnicode(Bytes({'a', 0x03, 'b', 0, 'c'}), text);
    EXPECT_EQ(text, Units({'a', 0x03, 'b'}));
}

} // namespace
