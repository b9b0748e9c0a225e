// Whole numbers from untrusted text (common/util/Number.h): digits only, never an overflow.
#include <gtest/gtest.h>

#include <cstdint>

#include "common/util/Number.h"

using harmona::util::ParseDecimalDigits;

namespace {

TEST(DecimalDigits, ReadsOneToEighteenDigits) {
    int64_t value = -1;
    EXPECT_TRUE(ParseDecimalDigits("0", value));
    EXPECT_EQ(value, 0);
    EXPECT_TRUE(ParseDecimalDigits("007", value));
    EXPECT_EQ(value, 7);
    EXPECT_TRUE(ParseDecimalDigits("999999999999999999", value));
    EXPECT_EQ(value, INT64_C(999999999999999999));
}

TEST(DecimalDigits, RefusesAnythingElseAndLeavesTheValue) {
    int64_t value = 42;
    for (const char* text : {"", "-1", "+1", " 1", "1 ", "1x", "0x10", "1.5", "1234567890123456789",
                             "99999999999999999999999"}) {
        SCOPED_TRACE(text);
        EXPECT_FALSE(ParseDecimalDigits(text, value));
        EXPECT_EQ(value, 42);
    }
    EXPECT_FALSE(ParseDecimalDigits(std::string_view("1\0", 2), value));
}

}  // namespace
