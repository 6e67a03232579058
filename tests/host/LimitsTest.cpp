// What people write of sizes and limits, and what they are told of them.
#include "host/file/Limits.h"

#include <gtest/gtest.h>

#include "host/base/ScaledNumber.h"

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

TEST(Limits, TellWhatTheyAre) {
    EXPECT_EQ(Limits().Text(), "bands=65536, tile=16M, elements=131072, header=4M, document=256M");
}

TEST(Limits, AreNamedWithTheWayToRaiseThem) {
    EXPECT_EQ(Limits::Judge(&Limits::bands, Limits::Current().bands, "it has many"), "");
    EXPECT_EQ(Limits::Judge(&Limits::bands, 70000, "it has 70000 bands"),
              "it has 70000 bands, beyond the limit of 65536; ZMC_LIMITS=bands=70000 raises it");
    EXPECT_EQ(
        Limits::Judge(&Limits::document, (1u << 28) + 1, "it has more"),
        "it has more, beyond the limit of 268435456; ZMC_LIMITS=document=268435457 raises it");
}

}  // namespace
}  // namespace zmchost
