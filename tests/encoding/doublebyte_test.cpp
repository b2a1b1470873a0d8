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

struct DecodeCase
{
    const char *what;
    KestoEncodingFormat format;
    QByteArray in;
    QString out;
};

void PrintTo(const DecodeCase &c, std::ostream *os)
{
    *os << c.what;
}

class DecodeBlock : public ::testing::TestWithParam<DecodeCase>
{
};

TEST_P(DecodeBlock, AppendsToOutput)
{
    const DecodeCase &c = GetParam();
    EXPECT_EQ(Decode(c.format, c.in, "x"), "x" + c.out) << c.what;
}

INSTANTIATE_TEST_SUITE_P(
    Blocks, DecodeBlock,
    ::testing::Values(
        DecodeCase{"GB2312 pair then ASCII", ENCODING_GB2312, Bytes({0xA1, 0xA1, 0x41}), Units({0x3000, 'A'})},
        DecodeCase{"GB2312 mark is decoded too", ENCODING_GB2312, Bytes({0xFC, 0xFE, 0xB0, 0xA1}),
                   Units({'?', '?', 0x554A})},
        DecodeCase{"GB2312 lead takes an ASCII trail", ENCODING_GB2312, Bytes({0xA1, 0x41, 0x42}), Units({'?', 'B'})},
        DecodeCase{"GB2312 lone lead at the end", ENCODING_GB2312, Bytes({0x41, 0xB0}), Units({'A', '?'})},
        DecodeCase{"GB2312 stops at NUL", ENCODING_GB2312, Bytes({0x41, 0x00, 0x42}), Units({'A'})},
        DecodeCase{"GB2312 byte 80", ENCODING_GB2312, Bytes({0x80, 0x41}), Units({'?', 'A'})},
        DecodeCase{"S-JIS ASCII backslash and tilde", ENCODING_SJIS, Bytes({0x5C, 0x7E}), Units({0x5C, 0x7E})},
        DecodeCase{"S-JIS half-width katakana", ENCODING_SJIS, Bytes({0xA1, 0xDF}), Units({0xFF61, 0xFF9F})},
        DecodeCase{"S-JIS kanji and kana", ENCODING_SJIS, Bytes({0x88, 0x9F, 0x82, 0xA0}), Units({0x4E9C, 0x3042})},
        DecodeCase{"S-JIS user area skips 7F", ENCODING_SJIS, Bytes({0xF0, 0x7E, 0xF0, 0x80, 0xF9, 0xFC}),
                   Units({0xE03E, 0xE03F, 0xE757})},
        DecodeCase{"S-JIS user area has no 7F trail", ENCODING_SJIS, Bytes({0xF0, 0x7F}), Units({'?'})},
        DecodeCase{"S-JIS lone lead at the end", ENCODING_SJIS, Bytes({0x41, 0x81}), Units({'A', '?'})},
        DecodeCase{"S-JIS unassigned bytes", ENCODING_SJIS, Bytes({0x80, 0xA0, 0xFD}), Units({'?', '?', '?'})},
        DecodeCase{"KSC5601 Hangul", ENCODING_KSC5601, Bytes({0xB0, 0xA1, 0x41}), Units({0xAC00, 'A'})},
        DecodeCase{"KSC5601 mark is unmapped", ENCODING_KSC5601, Bytes({0xFE, 0xFE, 0x41}), Units({' ', 'A'})},
        DecodeCase{"KSC5601 has no extension", ENCODING_KSC5601, Bytes({0x81, 0x41}), Units({' '})},
        DecodeCase{"KSC5601 lead before NUL", ENCODING_KSC5601, Bytes({0x41, 0xB0, 0x00, 0xA1}), Units({'A', ' '})},
        DecodeCase{"KSC5601 lone lead at the end", ENCODING_KSC5601, Bytes({0xB0}), Units({' '})},
        DecodeCase{"KSC5601 controls pass", ENCODING_KSC5601, Bytes({0x01, 0x7F}), Units({0x01, 0x7F})},
        DecodeCase{"CP949 extension", ENCODING_CP949, Bytes({0x81, 0x41, 0xB0, 0xA1}), Units({0xAC02, 0xAC00})},
        DecodeCase{"CP949 unmapped", ENCODING_CP949, Bytes({0xC9, 0xA1, 0x80, 0x41}), Units({' ', ' '})},
        DecodeCase{"CP949 stops at NUL", ENCODING_CP949, Bytes({0x41, 0x00, 0x42}), Units({'A'})}));

struct EncodeCase
{
    const char *what;
    KestoEncodingFormat format;
    QString in;
    QByteArray out;
};

void PrintTo(const EncodeCase &c, std::ostream *os)
{
    *os << c.what;
}

class EncodeString : public ::testing::TestWithParam<EncodeCase>
{
};

TEST_P(EncodeString, ReplacesOutput)
{
    const EncodeCase &c = GetParam();
    QByteArray out("stale");
    EXPECT_EQ(Make(c.format)->FromUnicode(c.in, out), unsigned(c.out.size())) << c.what;
    EXPECT_EQ(out, c.out) << c.what;
}

INSTANTIATE_TEST_SUITE_P(
    Strings, EncodeString,
    ::testing::Values(
        EncodeCase{"GB2312 ideographic space", ENCODING_GB2312, Units({0x3000, 'A'}), Bytes({0xA1, 0xA1, 0x41})},
        EncodeCase{"GB2312 NUL adds nothing", ENCODING_GB2312, Units({'A', 0, 'B'}), "AB"},
        EncodeCase{"GB2312 unmapped", ENCODING_GB2312, Units({0xAC00, 0xD800}), "??"},
        EncodeCase{"S-JIS user area start", ENCODING_SJIS, Units({0xE000}), Bytes({0xF0, 0x40})},
        EncodeCase{"S-JIS user area skips 7F", ENCODING_SJIS, Units({0xE03E, 0xE03F}), Bytes({0xF0, 0x7E, 0xF0, 0x80})},
        EncodeCase{"S-JIS user area end", ENCODING_SJIS, Units({0xE757, 0xE758}), Bytes({0xF9, 0xFC, '?'})},
        EncodeCase{"S-JIS ASCII and katakana", ENCODING_SJIS, Units({0x5C, 0x7E, 0xFF61}), Bytes({0x5C, 0x7E, 0xA1})},
        EncodeCase{"S-JIS yen sign is not ASCII", ENCODING_SJIS, Units({0xA5}), "?"},
        EncodeCase{"KSC5601 Hangul", ENCODING_KSC5601, Units({0xAC00, 'a'}), Bytes({0xB0, 0xA1, 'a'})},
        EncodeCase{"KSC5601 has no extension", ENCODING_KSC5601, Units({0xAC02, 0xE9}), "??"},
        EncodeCase{"CP949 extension", ENCODING_CP949, Units({0xAC02, 0xAC00}), Bytes({0x81, 0x41, 0xB0, 0xA1})},
        EncodeCase{"CP949 unmapped", ENCODING_CP949, Units({0xE000, 'z'}), "?z"}));

TEST(Cp949, UnmappedUnitWritesBlank)
{
    char bytes[QEncoding::kMaxEncodedSize] = {'x', 'x', 'x', 'x', 'x'};
    EXPECT_FALSE(Make(ENCODING_CP949)->UnicodeToChar(0xE000, bytes));
    EXPECT_EQ(QByteArray(bytes), " ");
}

TEST(SJis, UserAreaRoundTrips)
{
    EncoderPtr sjis = Make(ENCODING_SJIS);
    for (char16_t unit = 0xE000; unit <= 0xE757; ++unit) {
        QByteArray bytes;
        sjis->FromUnicode(QString(QChar(unit)), bytes);
        ASSERT_EQ(bytes.size(), 2) << unsigned(unit);
        const auto lead = quint8(bytes[0]);
        const auto trail = quint8(bytes[1]);
        EXPECT_TRUE(lead >= 0xF0 && lead <= 0xF9 && trail >= 0x40 && trail <= 0xFC && trail != 0x7F);
        QString back;
        sjis->ToUnicode(bytes, back);
        EXPECT_EQ(back, QString(QChar(unit)));
    }
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
                         ::testing::Values(ENCODING_GB2312, ENCODING_SJIS, ENCODING_KSC5601, ENCODING_CP949));

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
