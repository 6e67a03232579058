#include "host/base/BigInteger.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <cmath>

namespace {

using zmchost::BigInteger;
using zmchost::Int128;

// What a BigInteger holds, if it fits.
Int128 Value(const BigInteger& number) {
    std::int64_t exponent = 0;
    const long double significand = number.Split(exponent);
    return static_cast<Int128>(std::ldexp(significand, static_cast<int>(exponent)));
}

RC_GTEST_PROP(BigInteger, ArithmeticOfSmallNumbers, (std::int32_t a, std::int32_t b)) {
    const auto x = BigInteger::Signed(a);
    const auto y = BigInteger::Signed(b);
    BigInteger sum = x;
    sum += y;
    RC_ASSERT(Value(sum) == Int128{a} + b);
    RC_ASSERT(Value(x - y) == Int128{a} - b);
    RC_ASSERT(Value(x * y) == Int128{a} * b);
    RC_ASSERT((x - x).Zero());
    RC_ASSERT((x - y).Negative() == (a < b));
}

RC_GTEST_PROP(BigInteger, ProductsDistributeOverSums,
              (std::int64_t a, std::int64_t b, std::int64_t c, std::uint8_t shift)) {
    const auto x = BigInteger::Signed(a, shift);
    const auto y = BigInteger::Signed(b, 3u * shift);
    const auto z = BigInteger::Signed(c, 7);
    BigInteger sum = y;
    sum += z;
    BigInteger products = x * y;
    products += x * z;
    RC_ASSERT((x * sum - products).Zero());
}

RC_GTEST_PROP(BigInteger, ShiftMultipliesByPowersOfTwo, (std::int64_t a, std::uint8_t shift)) {
    std::int64_t exponent = 0;
    const long double significand = BigInteger::Signed(a, shift).Split(exponent);
    RC_ASSERT(std::ldexp(significand, static_cast<int>(exponent)) ==
              std::ldexp(static_cast<long double>(a), shift));
}

TEST(BigInteger, SplitRoundsOnWhatLiesFarBelow) {
    // 2^300 + 2^236 is a tie at 64 bits; one unit more tips it.
    BigInteger number(1, false, 300);
    number += BigInteger(1, false, 236);
    std::int64_t exponent = 0;
    const long double tie = number.Split(exponent);
    EXPECT_EQ(tie, 0.5L);
    number += BigInteger(1);
    EXPECT_GT(number.Split(exponent), 0.5L);
    EXPECT_EQ(exponent, 301);
}

TEST(BigInteger, ZeroHasNoSign) {
    std::int64_t exponent = 5;
    EXPECT_EQ(BigInteger().Split(exponent), 0);
    EXPECT_FALSE(BigInteger(0, true).Negative());
    EXPECT_TRUE(BigInteger(0, false, 100).Zero());
}

}  // namespace
