#include "host/base/ScaledNumber.h"

#include <gtest/gtest.h>

#include <cstdint>

namespace zmchost {
namespace {

TEST(ParseScaled, TakesOneUnitOfThoseThatAreGiven) {
    EXPECT_EQ(ParseScaled("0", "KMG"), 0u);
    EXPECT_EQ(ParseScaled("007", "KMG"), 7u);
    EXPECT_EQ(ParseScaled("3K", "KMG"), 3072u);
    EXPECT_EQ(ParseScaled("3m", "KMGkmg"), 3145728u);
    EXPECT_EQ(ParseScaled("2G", "KMGkmg"), std::uint64_t{2} << 30);
    EXPECT_EQ(ParseScaled("18446744073709551615", "KMG"), UINT64_MAX);
    EXPECT_EQ(ParseScaled("17179869183G", "KMG"), UINT64_MAX - (1u << 30) + 1);
    for (const char* const text : {"", "K", "3k", "3KK", "3T", "-3", "+3", " 3", "3 K", "1.5M",
                                   "0x3", "17179869184G", "18446744073709551616"})
        EXPECT_FALSE(ParseScaled(text, "KMG")) << text;
}

}  // namespace
}  // namespace zmchost
