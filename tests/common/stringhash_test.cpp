#include "common/stringhash.h"

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

// Values of the stored-file hash, worked out independently of this code (long inputs exercise the fold of the top
// nibble; the last one a surrogate pair, hashed as two UTF-16 units).
TEST(StringHash, MatchesTheStoredHashOfEveryCacheName)
{
    const std::pair<QString, unsigned int> rows[] = {{u""_s, 0},
                                                     {u"a"_s, 97},
                                                     {u"ab"_s, 1650},
                                                     {u"abcdefgh"_s, 144355384},
                                                     {u"C:/kits/Test Kit 1"_s, 19847025},
                                                     {u"\U0001F600x"_s, 15080824}};
    for (const auto &[text, hash] : rows) {
        EXPECT_EQ(StringHash(text), hash) << text.toStdString();
        EXPECT_EQ(StringHashName(text), u"#%1"_s.arg(hash));
    }
}

} // namespace
