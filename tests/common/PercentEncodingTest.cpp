// Percent-encoding of URL and id parts: the unreserved characters stay, every other byte is "%XX"
// in upper-case hex, and the strict reverse refuses a "%" without two hex digits after it.
#include <gtest/gtest.h>

#include <string>

#include "common/util/PercentEncoding.h"

namespace harmona::util {
namespace {

TEST(PercentEncoding, UnreservedCharactersStayAndEveryOtherByteIsEscapedInUpperCase) {
    EXPECT_EQ(PercentEncode("AZaz09._~-"), "AZaz09._~-");
    EXPECT_EQ(PercentEncode("a b/c&d=%"), "a%20b%2Fc%26d%3D%25");
    EXPECT_EQ(PercentEncode("\xC3\xA9\x7F"), "%C3%A9%7F");
    EXPECT_EQ(PercentEncode(std::string("a\0b", 3)), "a%00b");
    EXPECT_EQ(PercentEncode(""), "");
}

TEST(PercentEncoding, DecodingGivesBackWhatWasEncodedAndReadsEitherCase) {
    std::string out;
    const std::string text("Caf\xC3\xA9 / 50% & more\0", 20);
    ASSERT_TRUE(PercentDecode(PercentEncode(text), &out));
    EXPECT_EQ(out, text);
    ASSERT_TRUE(PercentDecode("%2f%2F+x", &out));
    EXPECT_EQ(out, "//+x");
}

TEST(PercentEncoding, APercentWithoutTwoHexDigitsIsRefused) {
    std::string out;
    for (const char* bad : {"%", "%4", "abc%", "%G1", "%1G", "x%-1"})
        EXPECT_FALSE(PercentDecode(bad, &out)) << bad;
}

}  // namespace
}  // namespace harmona::util
