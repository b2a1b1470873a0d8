#include "encodingtest.h"

#include <gtest/gtest.h>

#include <QRandomGenerator>

namespace {

using namespace encodingtest;

class Converter : public ::testing::TestWithParam<KestoEncodingFormat>
{
};

// Latin-1 is left out: it keeps only the low byte of any unit.
class MultiByteConverter : public ::testing::TestWithParam<KestoEncodingFormat>
{
};

// Every unit a converter encodes comes back from decoding the whole string,
// so lead and trail bytes are never taken apart.
TEST_P(MultiByteConverter, RoundTripsEveryEncodableUnit)
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

INSTANTIATE_TEST_SUITE_P(Converters, MultiByteConverter,
                         ::testing::Values(ENCODING_UTF8, ENCODING_GB2312, ENCODING_SJIS, ENCODING_KSC5601,
                                           ENCODING_CP949));

// Arbitrary bytes, biased towards lead bytes, NULs and marks. Each prefix is decoded from a buffer whose next byte is
// first a NUL, then a byte that would complete a code: a decoder reading past the block would notice. Null output
// pointers are refused, not followed.
TEST_P(Converter, NeverReadsPastTheBlock)
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
    for (unsigned int code : {0x41u, 0xB0A1u, 0xF040u, 0x8141u, 0xFFFFFu})
        encoding->CharToUnicode(code, nullptr);
    EXPECT_FALSE(encoding->UnicodeToChar('A', nullptr));
}

INSTANTIATE_TEST_SUITE_P(Converters, Converter,
                         ::testing::Values(ENCODING_UTF8, ENCODING_ISOLATIN1, ENCODING_GB2312, ENCODING_SJIS,
                                           ENCODING_KSC5601, ENCODING_CP949));

} // namespace
