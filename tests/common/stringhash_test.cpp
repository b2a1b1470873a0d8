#include "common/stringhash.h"

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

struct HashCase
{
    const char16_t *text;
    unsigned int hash;
};

class StringHashTest : public ::testing::TestWithParam<HashCase>
{
};

TEST_P(StringHashTest, MatchesTheStoredHashOfEveryCacheName)
{
    const QString text = QString::fromUtf16(GetParam().text);
    EXPECT_EQ(StringHash(text), GetParam().hash);
    EXPECT_EQ(StringHashName(text), u"#%1"_s.arg(GetParam().hash));
}

// Values of the stored-file hash, worked out independently of this code
// (long inputs exercise the fold of the top nibble; the last one a
// surrogate pair, hashed as two UTF-16 units).
INSTANTIATE_TEST_SUITE_P(KnownValues, StringHashTest,
                         ::testing::Values(HashCase{u"", 0}, HashCase{u"a", 97}, HashCase{u"ab", 1650},
                                           HashCase{u"abcdefgh", 144355384}, HashCase{u"C:/kits/Test Kit 1", 19847025},
                                           HashCase{u"\U0001F600x", 15080824}),
                         [](const auto &info) { return std::to_string(info.index); });

} // namespace
