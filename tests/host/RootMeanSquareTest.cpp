#include "host/reduce/RootMeanSquare.h"

#include <gtest/gtest.h>

#include <array>
#include <bit>
#include <cstdint>
#include <random>
#include <vector>

#include "core/ElementTypes.h"
#include "host/base/BigInteger.h"
#include "host/base/Int128.h"

namespace {

using zmchost::BigInteger;
using zmchost::Int128;
using zmchost::RootMeanSquare;
using zmchost::UInt128;

// Every value here is a whole number of units of 2 to the -kUnit.
constexpr int kUnit = 1200;

template <class T>
BigInteger Exact(T value) {
    if constexpr (std::is_integral_v<T>) {
        return BigInteger::Signed(static_cast<Int128>(value), kUnit);
    } else {
        int exponent = 0;
        const double significand = std::frexp(static_cast<double>(value), &exponent);
        const auto whole = static_cast<std::int64_t>(std::ldexp(significand, 53));
        return BigInteger::Signed(whole, static_cast<std::uint32_t>(exponent - 53 + kUnit));
    }
}

// Sign of 4 * sum of squares - n * (2 * middle) squared, with 2 * middle given.
int Side(const std::vector<BigInteger>& values, const BigInteger& twiceMiddle) {
    BigInteger squares;
    for (const BigInteger& value : values) squares += value * value;
    const BigInteger difference =
        BigInteger(4) * squares - BigInteger(values.size()) * twiceMiddle * twiceMiddle;
    return difference.Zero() ? 0 : difference.Negative() ? -1 : 1;
}

template <class T>
void ExpectNearest(const T* values, int count) {
    const zmchost::Rounded<T> root = RootMeanSquare(values, count);
    std::vector<BigInteger> exact;
    for (int i = 0; i < count; ++i) exact.push_back(Exact(values[i]));
    const auto twiceMiddle = [&](T neighbour) {
        BigInteger sum = Exact(root.value);
        sum += Exact(neighbour);
        return sum;
    };
    BigInteger twice = Exact(root.value);
    twice += twice;
    if constexpr (std::is_integral_v<T>) {
        EXPECT_EQ(Side(exact, twice), root.direction);
    }
    constexpr T top = std::numeric_limits<T>::max();
    if constexpr (std::is_integral_v<T>) {
        if (root.value != top) {
            EXPECT_LT(Side(exact, twiceMiddle(static_cast<T>(root.value + 1))), 0);
        }
        if (root.value != 0) {
            EXPECT_GE(Side(exact, twiceMiddle(static_cast<T>(root.value - 1))), 0);
        }
    } else {
        const bool even =
            (std::bit_cast<std::array<unsigned char, sizeof(T)>>(root.value)[0] & 1) == 0;
        if (root.value != top) {
            const int side = Side(exact, twiceMiddle(std::nextafter(root.value, top)));
            EXPECT_TRUE(side < 0 || (side == 0 && even)) << root.value;
        }
        if (root.value != 0) {
            const int side = Side(exact, twiceMiddle(std::nextafter(root.value, T(0))));
            EXPECT_TRUE(side > 0 || (side == 0 && even)) << root.value;
        }
    }
}

template <class T>
T AnyValue(std::mt19937_64& random) {
    if constexpr (std::is_floating_point_v<T>) {
        const int spread = 1 << random() % 7;
        const auto bits = static_cast<std::int64_t>(random()) >> random() % 63;
        return std::ldexp(static_cast<T>(bits),
                          static_cast<int>(random() % static_cast<unsigned>(spread)) - 60);
    } else {
        if (random() % 4 == 0) return std::numeric_limits<T>::min();
        if (random() % 4 == 0) return std::numeric_limits<T>::max();
        return static_cast<T>(static_cast<std::int64_t>(random()) >> random() % 63);
    }
}

template <class T>
void CheckType() {
    if constexpr (!zelm::kIsComplex<T>) {
        std::mt19937_64 random(3);
        for (int round = 0; round < 3000; ++round) {
            const T values[] = {AnyValue<T>(random), AnyValue<T>(random), AnyValue<T>(random),
                                AnyValue<T>(random)};
            ExpectNearest(values, 1 + round % 4);
        }
    }
}

TEST(RootMeanSquare, NoNeighbourIsNearer) {
#define ZMC_X(type, name, code) CheckType<type>();
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
}

TEST(RootMeanSquare, HalvesOfIntegersGoUp) {
    const unsigned char values[] = {0, 0, 0, 1};  // the root of 1/4
    EXPECT_EQ(RootMeanSquare(values, 4).value, 1);
    const std::int64_t large[] = {0, 0, 0, (std::int64_t{1} << 62) + 1};
    EXPECT_EQ(RootMeanSquare(large, 4).value, (std::int64_t{1} << 61) + 1);
}

TEST(RootMeanSquare, TiesOfFloatsGoToEven) {
    // Half of an odd value with all digits lies in the middle of two only below the normal range.
    const double tiny = std::numeric_limits<double>::denorm_min();
    for (const double odd : {1.0, 3.0, 5.0, 7.0}) {
        const double values[] = {odd * tiny, 0, 0, 0};
        ExpectNearest(values, 4);
    }
    // Three equal and one that tips the scale, far below the digits of any sum.
    const float middle[] = {1.0F, 1.0F + 0x1p-22F, 1.0F, 0x1p-100F};
    ExpectNearest(middle, 4);
}

TEST(RootMeanSquare, SmallestValueIsHalfOfNothing) {
    const double tiny = std::numeric_limits<double>::denorm_min();
    const double values[] = {tiny, 0, 0, 0};
    EXPECT_EQ(RootMeanSquare(values, 4).value, 0);  // a half, to even
}

TEST(RootMeanSquare, WhatTheTypeCannotHoldIsClamped) {
    const char bytes[] = {-128, -128, -128, -128};
    EXPECT_EQ(RootMeanSquare(bytes, 4).value, 127);
    EXPECT_EQ(RootMeanSquare(bytes, 4).direction, 1);
    const std::int64_t low = std::numeric_limits<std::int64_t>::min();
    const std::int64_t longs[] = {low, low, low};
    EXPECT_EQ(RootMeanSquare(longs, 3).value, std::numeric_limits<std::int64_t>::max());
    const std::uint64_t top = std::numeric_limits<std::uint64_t>::max();
    const std::uint64_t all[] = {top, top, top, top};
    EXPECT_EQ(RootMeanSquare(all, 4).value, top);
}

}  // namespace
