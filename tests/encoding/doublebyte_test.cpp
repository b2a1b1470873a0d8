#include "encodingtest.h"

#include <gtest/gtest.h>

#include <QRandomGenerator>

namespace {

using namespace encodingtest;

QString Decode(KestoEncodingFormat format, const QByteArray &bytes, const QString &before = QString())
{
    QString out = before;
    const int length = Make(format)->ToUnicode(bytes, out);
    EXPECT_EQ(length, out.size());
    return out;
}

// Bytes and text that a converter turns into each other: decoding appends the
// text to what the output held, encoding replaces the output by the bytes.
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
    {"GB2312 pair then ASCII", ENCODING_GB2312, kBoth, Bytes({0xA1, 0xA1, 0x41}), Units({0x3000, 'A'})},
    {"GB2312 mark is decoded too", ENCODING_GB2312, kDecodes, Bytes({0xFC, 0xFE, 0xB0, 0xA1}),
     Units({'?', '?', 0x554A})},
    {"GB2312 lead takes an ASCII trail", ENCODING_GB2312, kDecodes, Bytes({0xA1, 0x41, 0x42}), Units({'?', 'B'})},
    {"GB2312 lone lead at the end", ENCODING_GB2312, kDecodes, Bytes({0x41, 0xB0}), Units({'A', '?'})},
    {"GB2312 stops at NUL", ENCODING_GB2312, kDecodes, Bytes({0x41, 0x00, 0x42}), Units({'A'})},
    {"GB2312 byte 80", ENCODING_GB2312, kDecodes, Bytes({0x80, 0x41}), Units({'?', 'A'})},
    {"GB2312 NUL adds nothing", ENCODING_GB2312, kEncodes, "AB", Units({'A', 0, 'B'})},
    {"GB2312 unmapped", ENCODING_GB2312, kEncodes, "??", Units({0xAC00, 0xD800})},
    {"S-JIS ASCII and katakana", ENCODING_SJIS, kBoth, Bytes({0x5C, 0x7E, 0xA1, 0xDF}),
     Units({0x5C, 0x7E, 0xFF61, 0xFF9F})},
    {"S-JIS kanji and kana", ENCODING_SJIS, kDecodes, Bytes({0x88, 0x9F, 0x82, 0xA0}), Units({0x4E9C, 0x3042})},
    {"S-JIS user area skips 7F", ENCODING_SJIS, kBoth, Bytes({0xF0, 0x40, 0xF0, 0x7E, 0xF0, 0x80, 0xF9, 0xFC}),
     Units({0xE000, 0xE03E, 0xE03F, 0xE757})},
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
    {"CP949 stops at NUL", ENCODING_CP949, kDecodes, Bytes({0x41, 0x00, 0x42}), Units({'A'})},
};

class Converts : public ::testing::TestWithParam<Conversion>
{
};

TEST_P(Converts, BytesToTextAndBack)
{
    const Conversion &c = GetParam();
    if (c.ways & kDecodes)
        EXPECT_EQ(Decode(c.format, c.bytes, "x"), "x" + c.text) << c.what;
    if (c.ways & kEncodes) {
        QByteArray out("stale");
        EXPECT_EQ(Make(c.format)->FromUnicode(c.text, out), unsigned(c.bytes.size())) << c.what;
        EXPECT_EQ(out, c.bytes) << c.what;
    }
}

INSTANTIATE_TEST_SUITE_P(DoubleByte, Converts, ::testing::ValuesIn(kConversions));

TEST(Cp949, UnmappedUnitWritesBlank)
{
    char bytes[QEncoding::kMaxEncodedSize] = {'x', 'x', 'x', 'x', 'x'};
    EXPECT_FALSE(Make(ENCODING_CP949)->UnicodeToChar(0xE000, bytes));
    EXPECT_EQ(QByteArray(bytes), " ");
}

// Every unit a converter encodes comes back from decoding the whole string,
// so lead and trail bytes are never taken apart.
class RoundTrip : public ::testing::TestWithParam<KestoEncodingFormat>
{
};

TEST_P(RoundTrip, EveryEncodableUnit)
{
    EncoderPtr encoding = Make(GetParam());
    QString encodable;
    for (unsigned int unit = 1; unit <= 0xFFFF; ++unit) {
        char bytes[QEncoding::kMaxEncodedSize] = {};
        if (encoding->UnicodeToChar(unit, bytes))
            encodable.append(QChar(char16_t(unit)));
    }
    EXPECT_GT(encodable.size(), 6000);
    QByteArray bytes;
    encoding->FromUnicode(encodable, bytes);
    QString back;
    encoding->ToUnicode(bytes, back);
    EXPECT_EQ(back, encodable);
}

INSTANTIATE_TEST_SUITE_P(Converters, RoundTrip,
                         ::testing::Values(ENCODING_UTF8, ENCODING_GB2312, ENCODING_SJIS, ENCODING_KSC5601,
                                           ENCODING_CP949));

// Arbitrary bytes, biased towards lead bytes, NULs and marks. Each prefix is
// decoded from a buffer whose next byte is first a NUL, then a byte that
// would complete a code: a decoder reading past the block would notice.
class ArbitraryBytes : public ::testing::TestWithParam<KestoEncodingFormat>
{
};

TEST_P(ArbitraryBytes, NeverReadPastTheBlock)
{
    EncoderPtr encoding = Make(GetParam());
    QRandomGenerator random(20261206u + unsigned(GetParam()));
    static constexpr quint8 kInteresting[]
        = {0x00, 0x02, 0x03, 0x41, 0x7F, 0x80, 0x81, 0xA1, 0xB0, 0xC3, 0xE0, 0xED, 0xF0, 0xF4, 0xF7, 0xFC, 0xFE, 0xFF};
    for (int round = 0; round < 400; ++round) {
        const int size = int(random.bounded(24));
        QByteArray buffer(size + 1, '\0');
        for (int i = 0; i < size; ++i) {
            buffer[i] = random.bounded(2) ? char(kInteresting[random.bounded(int(sizeof kInteresting))])
                                          : char(random.bounded(256));
        }
        for (int cut = 0; cut <= size; ++cut) {
            const char saved = buffer[cut];
            buffer[cut] = '\0';
            QString first;
            encoding->ToUnicode(QByteArray::fromRawData(buffer.constData(), cut), first);
            buffer[cut] = char(0xA1);
            QString second;
            encoding->ToUnicode(QByteArray::fromRawData(buffer.constData(), cut), second);
            buffer[cut] = saved;
            ASSERT_EQ(first, second) << "read past " << cut << " bytes of " << buffer.toHex().constData();
            ASSERT_LE(first.size(), cut);
            ASSERT_FALSE(first.contains(QChar(u'\0')));
        }
    }
}

TEST_P(ArbitraryBytes, NullPointersAreRefusedNotFollowed)
{
    EncoderPtr encoding = Make(GetParam());
    for (unsigned int code : {0x41u, 0xB0A1u, 0xF040u, 0x8141u, 0xFFFFFu})
        encoding->CharToUnicode(code, nullptr);
    EXPECT_FALSE(encoding->UnicodeToChar('A', nullptr));
}

INSTANTIATE_TEST_SUITE_P(Converters, ArbitraryBytes,
                         ::testing::Values(ENCODING_UTF8, ENCODING_ISOLATIN1, ENCODING_GB2312, ENCODING_SJIS,
                                           ENCODING_KSC5601, ENCODING_CP949));

} // namespace
