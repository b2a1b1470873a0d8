// Every code of the double-byte converters checked against glibc's iconv
// converters, which are independent of the tables compiled into the library.

#include "encodingtest.h"

#include <gtest/gtest.h>

#include <iconv.h>

#include <cstring>
#include <map>
#include <optional>
#include <string>

namespace {

// One iconv conversion descriptor, reset before every conversion.
class Iconv
{
public:
    Iconv(const char *to, const char *from) : m_cd(iconv_open(to, from)) { }
    ~Iconv()
    {
        if (Valid())
            iconv_close(m_cd);
    }
    Iconv(const Iconv &) = delete;
    Iconv &operator=(const Iconv &) = delete;

    bool Valid() const { return m_cd != reinterpret_cast<iconv_t>(-1); }

    // The whole input converted, or nothing when iconv refuses any of it.
    std::optional<std::string> Convert(std::string input)
    {
        iconv(m_cd, nullptr, nullptr, nullptr, nullptr);
        char outBuffer[16];
        char *inPtr = input.data();
        size_t inLeft = input.size();
        char *outPtr = outBuffer;
        size_t outLeft = sizeof outBuffer;
        if (iconv(m_cd, &inPtr, &inLeft, &outPtr, &outLeft) == size_t(-1) || inLeft != 0)
            return std::nullopt;
        if (iconv(m_cd, nullptr, nullptr, &outPtr, &outLeft) == size_t(-1))
            return std::nullopt;
        return std::string(outBuffer, sizeof outBuffer - outLeft);
    }

private:
    iconv_t m_cd;
};

std::string CodeBytes(unsigned int code)
{
    if (code < 0x100)
        return std::string(1, char(code));
    return std::string{char(code >> 8), char(code & 0xFF)};
}

std::string Hex(unsigned int value)
{
    return QString::asprintf("%04X", value).toStdString();
}

std::string HexBytes(const std::string &bytes)
{
    return QByteArray::fromStdString(bytes).toHex().toUpper().toStdString();
}

// The places where the library deliberately differs from glibc, each with its
// reason: a code when decoding, a unit when encoding.
using Known = std::map<unsigned int, const char *>;

// Every difference found must be listed, and every listed one must occur.
void ExpectOnlyKnown(const char *table, const char *what, const std::map<unsigned int, std::string> &found,
                     const Known &known)
{
    for (const auto &[value, detail] : found) {
        if (!known.count(value))
            ADD_FAILURE() << table << " " << what << Hex(value) << ": " << detail;
    }
    for (const auto &[value, reason] : known) {
        if (!found.count(value))
            ADD_FAILURE() << table << " " << what << Hex(value) << " agrees with iconv, though listed as: " << reason;
    }
}

struct TableCase
{
    const char *name;
    KestoEncodingFormat format;
    const char *iconvName;
    bool (*isLead)(unsigned char);
    std::size_t expectedTwoByteCodes;
    Known decodeDifferences, encodeDifferences;
};

bool KsLead(unsigned char b)
{
    return b >= 0x80;
}

const char *kSjisAscii = "single bytes 5C and 7E are ASCII here, as in Python's shift_jis; "
                         "glibc's SHIFT_JIS reads them as U+00A5 and U+203E";
const char *kSjisUserArea = "user-defined area: lead bytes F0 and above decode to U+E000 onwards, "
                            "which glibc's SHIFT_JIS leaves unmapped";
const char *kKsX1001Postal = "A2E8 (U+327E) was added to KS X 1001 in 2002; code page 949, whose "
                             "KS X 1001 part is used here, does not have it";

const char *kKsC1Controls = "every byte with the high bit set is a lead byte here, so the C1 "
                            "controls have no one-byte form; glibc's EUC-KR passes them through";

TableCase MakeCase(const char *name)
{
    const std::string which = name;
    if (which == "GB2312")
        return {name, ENCODING_GB2312, "GB2312", [](unsigned char b) { return b >= 0xA1 && b <= 0xF7; }, 7445, {}, {}};
    if (which == "SJIS") {
        const auto isSjisLead = [](unsigned char b) {
            return (b >= 0x81 && b <= 0x9F) || (b >= 0xE0 && b <= 0xFC);
        };
        TableCase c{name, ENCODING_SJIS, "SHIFT_JIS", isSjisLead, 6879, {}, {}};
        c.decodeDifferences = {{0x5C, kSjisAscii}, {0x7E, kSjisAscii}};
        for (unsigned int lead = 0xF0; lead <= 0xFC; ++lead)
            for (unsigned int trail = 0x40; trail <= 0xFC; ++trail)
                if (trail != 0x7F)
                    c.decodeDifferences[lead << 8 | trail] = kSjisUserArea;
        c.encodeDifferences = {{0x5C, kSjisAscii}, {0x7E, kSjisAscii}, {0xA5, kSjisAscii}, {0x203E, kSjisAscii}};
        for (unsigned int unit = 0xE000; unit <= 0xE757; ++unit)
            c.encodeDifferences[unit] = kSjisUserArea;
        return c;
    }
    if (which == "KSC5601") {
        TableCase c{name, ENCODING_KSC5601, "EUC-KR", KsLead, 8226, {}, {}};
        c.decodeDifferences = {{0xA2E8, kKsX1001Postal}};
        c.encodeDifferences = {{0x327E, kKsX1001Postal}};
        for (unsigned int unit = 0x80; unit <= 0x9F; ++unit)
            c.encodeDifferences[unit] = kKsC1Controls;
        return c;
    }
    return {name, ENCODING_CP949, "CP949", KsLead, 17048, {}, {}};
}

class AgainstIconv : public ::testing::TestWithParam<const char *>
{
};

TEST_P(AgainstIconv, EveryCodeDecodesAndEncodesAsGlibc)
{
    const TableCase c = MakeCase(GetParam());
    Iconv decoder("UTF-16LE", c.iconvName);
    Iconv encoder(c.iconvName, "UTF-16LE");
    ASSERT_TRUE(decoder.Valid() && encoder.Valid()) << "glibc's iconv has no " << c.iconvName;
    const encodingtest::EncoderPtr encoding = encodingtest::Make(c.format);
    ASSERT_TRUE(encoding);

    // Decoding: every code the decoder can form, one byte or lead + trail.
    std::map<unsigned int, std::string> decodeDifferences;
    std::size_t agreeingTwoByteCodes = 0;
    for (unsigned int code = 0; code <= 0xFFFF; ++code) {
        const bool twoByte = code >= 0x100;
        if (twoByte ? !c.isLead(code >> 8) : c.isLead(code))
            continue;
        std::optional<unsigned int> theirs;
        if (auto out = decoder.Convert(CodeBytes(code)); out && out->size() == 2)
            theirs = unsigned(quint8((*out)[0])) | unsigned(quint8((*out)[1])) << 8;
        quint16 unit = 0;
        std::optional<unsigned int> ours;
        if (encoding->CharToUnicode(code, &unit))
            ours = unit;
        if (ours != theirs) {
            decodeDifferences[code]
                = "ours " + (ours ? Hex(*ours) : "none") + ", iconv " + (theirs ? Hex(*theirs) : "none");
            continue;
        }
        if (!ours)
            continue;
        agreeingTwoByteCodes += twoByte ? 1 : 0;
        QString text;
        encoding->ToUnicode(QByteArray::fromStdString(CodeBytes(code)), text);
        const QString expected = *ours == 0 ? QString() : QString(QChar(char16_t(*ours)));
        if (text != expected)
            decodeDifferences[code] = "ToUnicode differs from CharToUnicode";
    }
    EXPECT_EQ(agreeingTwoByteCodes, c.expectedTwoByteCodes);
    ExpectOnlyKnown(c.name, "decoding ", decodeDifferences, c.decodeDifferences);

    // Encoding: every unit of the basic plane (surrogate halves included),
    // where glibc's mapping is one-to-one: its bytes decode back to the unit.
    std::map<unsigned int, std::string> encodeDifferences;
    for (unsigned int unit = 0; unit <= 0xFFFF; ++unit) {
        const std::string utf16{char(unit & 0xFF), char(unit >> 8)};
        std::optional<std::string> theirs = encoder.Convert(utf16);
        if (theirs && decoder.Convert(*theirs) != utf16)
            theirs.reset();
        char bytes[QEncoding::kMaxEncodedSize] = {};
        std::optional<std::string> ours;
        if (encoding->UnicodeToChar(unit, bytes))
            ours = std::string(bytes, unit == 0 ? 1 : std::strlen(bytes));
        if (ours != theirs) {
            encodeDifferences[unit]
                = "ours " + (ours ? HexBytes(*ours) : "none") + ", iconv " + (theirs ? HexBytes(*theirs) : "none");
        }
    }
    ExpectOnlyKnown(c.name, "encoding U+", encodeDifferences, c.encodeDifferences);
}

INSTANTIATE_TEST_SUITE_P(Tables, AgainstIconv, ::testing::Values("GB2312", "SJIS", "KSC5601", "CP949"),
                         [](const auto &info) { return std::string(info.param); });

} // namespace
