#include "describe/JsonNumbers.h"

#include <gtest/gtest.h>

#include <limits>

namespace zmcdescribe {
namespace {

TEST(JsonNumbers, IntegersBeyondADoubleAreStrings) {
    EXPECT_EQ(JsonNumber(std::uint64_t{1} << 53).dump(), "9007199254740992");
    EXPECT_EQ(JsonNumber((std::uint64_t{1} << 53) + 1).dump(), "\"9007199254740993\"");
    EXPECT_EQ(JsonNumber(UINT64_MAX).dump(), "\"18446744073709551615\"");
    EXPECT_EQ(JsonNumber(INT64_MIN).dump(), "\"-9223372036854775808\"");
    EXPECT_EQ(JsonNumber(std::int64_t{-5}).dump(), "-5");
}

TEST(JsonNumbers, CharactersAreNumbers) {
    EXPECT_EQ(JsonNumber(static_cast<char>(-128)).dump(), "-128");
    EXPECT_EQ(JsonNumber(static_cast<unsigned char>(65)).dump(), "65");
}

TEST(JsonNumbers, WhatIsNotFiniteIsAWord) {
    constexpr double kInfinity = std::numeric_limits<double>::infinity();
    EXPECT_EQ(JsonNumber(std::numeric_limits<float>::quiet_NaN()), "NaN");
    EXPECT_EQ(JsonNumber(kInfinity), "Infinity");
    EXPECT_EQ(JsonNumber(-kInfinity), "-Infinity");
}

// Differences of 64-bit integers and of large reals.
TEST(JsonNumbers, LongRealsBeyondADoubleAreStrings) {
    EXPECT_EQ(JsonNumber(1.5L), Json(1.5));
    EXPECT_EQ(JsonNumber(9007199254740992.0L), Json(9007199254740992.0));
    EXPECT_EQ(JsonNumber(9007199254740993.0L), Json("9007199254740993"));
    EXPECT_EQ(JsonNumber(18446744073709551615.0L), Json("18446744073709551615"));
    EXPECT_EQ(JsonNumber(static_cast<long double>(1e300)), Json(1e300));
    EXPECT_TRUE(JsonNumber(2.0L * std::numeric_limits<double>::max()).is_string());
    EXPECT_EQ(JsonNumber(std::numeric_limits<long double>::infinity()), Json("Infinity"));
}

TEST(JsonNumbers, RealsComeBackUnchanged) {
    for (const double value : {0.1, 1e300, -1.0 / 3, 5e-324})
        EXPECT_EQ(Json::parse(JsonNumber(value).dump()).get<double>(), value);
}

TEST(JsonNumbers, ComplexNumbersArePairs) {
    EXPECT_EQ(JsonNumber(zelm::Complex<float>(1.5f, -2.0f)).dump(), "[1.5,-2.0]");
}

}  // namespace
}  // namespace zmcdescribe
