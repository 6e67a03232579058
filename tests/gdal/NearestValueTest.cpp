#include "gdal/NearestValue.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>

namespace zmcgdal {
namespace {

TEST(NearestValue, RoundsToTheNearestIntegerAndHalvesAwayFromZero) {
    EXPECT_EQ(NearestValue<std::int32_t>(2.4), 2);
    EXPECT_EQ(NearestValue<std::int32_t>(2.5), 3);
    EXPECT_EQ(NearestValue<std::int32_t>(-0.5), -1);
    EXPECT_EQ(NearestValue<std::int32_t>(-2.4), -2);
}

TEST(NearestValue, DiffersFromTheConversionThatCuts) {
    EXPECT_EQ(NearestValue<unsigned char>(299.7), 255);
    EXPECT_EQ(zelm::FromDouble<unsigned char>(299.7), 43);
    EXPECT_EQ(NearestValue<std::int16_t>(-1.7), -2);
    EXPECT_EQ(zelm::FromDouble<std::int16_t>(-1.7), -1);
}

TEST(NearestValue, ClampsToTheEndsOfTheType) {
    EXPECT_EQ(NearestValue<unsigned char>(-3), 0);
    EXPECT_EQ(NearestValue<std::int64_t>(9223372036854775808.0), INT64_MAX);
    EXPECT_EQ(NearestValue<std::int64_t>(-1e300), INT64_MIN);
    EXPECT_EQ(NearestValue<std::uint64_t>(1.8446744073709552e19), UINT64_MAX);
    EXPECT_EQ(NearestValue<std::uint64_t>(9007199254740992.0), 9007199254740992u);
    EXPECT_EQ(NearestValue<std::int32_t>(std::nan("")), INT32_MIN);
}

TEST(NearestValue, LeavesFloatsAndPutsNumbersIntoTheRealPart) {
    EXPECT_EQ(NearestValue<double>(0.1), 0.1);
    EXPECT_EQ(NearestValue<float>(0.1), 0.1f);
    EXPECT_TRUE(std::isnan(NearestValue<float>(std::nan(""))));
    EXPECT_TRUE(NearestValue<zelm::Complex<float>>(-2.5) == zelm::Complex<float>(-2.5f, 0));
}

}  // namespace
}  // namespace zmcgdal
