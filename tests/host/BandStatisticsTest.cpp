#include "host/statistics/BandStatistics.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <algorithm>
#include <cmath>
#include <random>
#include <vector>

#include "core/ElementTypes.h"

namespace {

using zmchost::BandAccumulator;

template <class T>
using Samples = std::vector<T>;

template <class T>
zelm::RasterBandStats<T> StatsOf(const Samples<T>& samples) {
    BandAccumulator<T> accumulator;
    accumulator.AddRow(samples.data(), nullptr, 0, 1, static_cast<std::uint32_t>(samples.size()));
    return accumulator.Stats(0);
}

template <class T>
Samples<T> Random(std::size_t n, bool wild, unsigned seed) {
    std::mt19937_64 random(seed);
    Samples<T> samples(n);
    for (T& sample : samples) {
        if constexpr (std::is_floating_point_v<T>)
            sample = std::ldexp(static_cast<T>(static_cast<std::int32_t>(random())),
                                wild ? static_cast<int>(random() % 60) - 60 : -10);
        else if constexpr (!zelm::kIsComplex<T>)
            sample = static_cast<T>(wild ? random() : random() % 100);
        else
            sample = T(1, 2);
    }
    return samples;
}

template <class T>
void ExpectSame(const zelm::RasterBandStats<T>& a, const zelm::RasterBandStats<T>& b) {
    EXPECT_EQ(a.count, b.count);
    EXPECT_EQ(a.flags, b.flags);
    EXPECT_TRUE(a.minimum == b.minimum);
    EXPECT_TRUE(a.maximum == b.maximum);
    EXPECT_EQ(a.mean, b.mean);
    EXPECT_EQ(a.standardDeviation, b.standardDeviation);
    EXPECT_EQ(a.sum, b.sum);
    EXPECT_EQ(a.sumOfSquares, b.sumOfSquares);
    EXPECT_EQ(a.rootMeanSquare, b.rootMeanSquare);
}

// The textbook: two passes in long double.
template <class T>
void ExpectTextbook(const Samples<T>& samples) {
    const auto stats = StatsOf(samples);
    const auto n = static_cast<long double>(samples.size());
    long double sum = 0;
    long double squares = 0;
    long double magnitudes = 0;
    for (const T sample : samples) {
        const long double value = sample;
        sum += value;
        magnitudes += std::abs(value);
        squares += value * value;
    }
    long double spread = 0;
    for (const T sample : samples) spread += (sample - sum / n) * (sample - sum / n);
    const auto near = [](long double found, long double expected, long double scale) {
        EXPECT_LE(std::abs(found - expected), 1e-15L * scale) << found << " " << expected;
    };
    EXPECT_EQ(stats.flags, zelm::StatsFlag::All);
    EXPECT_EQ(stats.count, samples.size());
    EXPECT_EQ(stats.minimum, *std::min_element(samples.begin(), samples.end()));
    EXPECT_EQ(stats.maximum, *std::max_element(samples.begin(), samples.end()));
    near(stats.sum, sum, magnitudes);
    near(stats.mean, sum / n, magnitudes / n);
    near(stats.sumOfSquares, squares, squares);
    near(stats.rootMeanSquare, std::sqrt(squares / n), std::sqrt(squares / n));
    near(stats.standardDeviation, std::sqrt(spread / n), std::sqrt(squares / n));
}

template <class T>
void CheckType() {
    SCOPED_TRACE(zelm::ElementTraits<T>::word);
    for (const bool wild : {false, true}) {
        const auto samples = Random<T>(5000, wild, 11);
        if constexpr (!zelm::kIsComplex<T>) {
            ExpectTextbook(samples);
        } else {
            const auto stats = StatsOf(samples);
            EXPECT_EQ(stats.flags, 0u);
            EXPECT_EQ(stats.count, samples.size());
        }
    }
}

TEST(BandStatistics, EveryTypeAgreesWithTheTextbook) {
#define ZMC_X(type, name, code) CheckType<type>();
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
}

// Dealt out to any number of accumulators, merged in any order: the same bits.
template <class T>
void CheckDivision(std::uint32_t parts, unsigned seed) {
    const auto samples = Random<T>(997, true, seed);
    std::vector<BandAccumulator<T>> accumulators(parts);
    std::mt19937 random(seed);
    for (std::size_t at = 0; at < samples.size();) {
        const std::size_t n = std::min<std::size_t>(random() % 50, samples.size() - at);
        accumulators[random() % parts].AddRow(samples.data() + at, nullptr, 0, 1,
                                              static_cast<std::uint32_t>(n));
        at += n;
    }
    std::shuffle(accumulators.begin(), accumulators.end(), random);
    BandAccumulator<T> whole;
    for (const auto& accumulator : accumulators) whole.Merge(accumulator);
    ExpectSame(whole.Stats(0), StatsOf(samples));
}

RC_GTEST_PROP(BandStatistics, DivisionOfWorkDoesNotShow, (std::uint8_t parts, std::uint16_t seed)) {
#define ZMC_X(type, name, code) CheckDivision<type>(parts + 1u, seed);
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
}

TEST(BandStatistics, LargeOffsetKeepsTheStandardDeviation) {
    Samples<double> doubles;
    Samples<std::int64_t> integers;
    for (int i = 0; i < 100000; ++i) {
        doubles.push_back(1e9 + (i % 2 == 0 ? 0x1p-20 : -0x1p-20));
        integers.push_back(std::int64_t{1} << 62 | (i % 2));
    }
    EXPECT_EQ(StatsOf(doubles).standardDeviation, 0x1p-20);
    EXPECT_EQ(StatsOf(doubles).mean, 1e9);
    EXPECT_EQ(StatsOf(integers).standardDeviation, 0.5);
    Samples<float> floats;
    for (int i = 0; i < 1000; ++i) floats.push_back(i % 2 == 0 ? 16777215.0F : 16777214.0F);
    EXPECT_EQ(StatsOf(floats).standardDeviation, 0.5);
}

TEST(BandStatistics, ConstantBandsDeviateByNothing) {
    for (const double value : {0.1, 1e300, -1e-300, 0.0, 5e-324}) {
        const auto stats = StatsOf(Samples<double>(1001, value));
        EXPECT_EQ(stats.standardDeviation, 0);
        EXPECT_EQ(stats.mean, value);
        EXPECT_EQ(stats.minimum, value);
        EXPECT_EQ(stats.maximum, value);
    }
}

TEST(BandStatistics, SumsThatCancelAreExact) {
    const Samples<double> samples = {1e308, 1.0, -1e308, 1e-300, -1.0};
    const auto stats = StatsOf(samples);
    EXPECT_EQ(stats.sum, 1e-300);
    EXPECT_EQ(stats.mean, 1e-300 / 5);
}

TEST(BandStatistics, WhatADoubleCannotHoldHasNoFlag) {
    const auto stats = StatsOf(Samples<double>{1e308, 1e308});
    EXPECT_EQ(stats.flags,
              zelm::StatsFlag::All & ~(zelm::StatsFlag::Sum | zelm::StatsFlag::SumOfSquares));
    EXPECT_EQ(stats.mean, 1e308);
    EXPECT_EQ(stats.rootMeanSquare, 1e308);
    EXPECT_EQ(stats.sum, 0);
}

TEST(BandStatistics, ExtremesOfSixtyFourBits) {
    constexpr auto low = std::numeric_limits<std::int64_t>::min();
    constexpr auto high = std::numeric_limits<std::int64_t>::max();
    Samples<std::int64_t> samples;
    for (int i = 0; i < 1000; ++i) samples.push_back(i % 2 == 0 ? low : high);
    const auto stats = StatsOf(samples);
    EXPECT_EQ(stats.sum, -500);
    EXPECT_EQ(stats.mean, -0.5);
    EXPECT_EQ(stats.standardDeviation, 0x1p63);
    EXPECT_EQ(stats.sumOfSquares, 1000 * 0x1p126);
    BandAccumulator<std::uint64_t> many;
    many.AddRepeated(~std::uint64_t{0}, std::uint64_t{1} << 62);
    EXPECT_EQ(many.Stats(0).sumOfSquares, 0x1p190);
    EXPECT_EQ(many.Stats(0).standardDeviation, 0);
}

TEST(BandStatistics, MasksBandsAndNonFiniteSamples) {
    const float row[] = {1, 10, NAN, 20, 3, 30, INFINITY, 40, 5, 50};
    const unsigned char mask[] = {0xFE, 0, 0, 1, 0, 0, 0, 0xFF, 2, 0};
    BandAccumulator<float> first;
    first.AddRow(row, mask, 0, 2, 5);
    EXPECT_EQ(first.Count(), 3u);
    EXPECT_EQ(first.Stats(0).sum, 9);
    BandAccumulator<float> second;
    second.AddRow(row, mask, 1, 2, 5);
    EXPECT_EQ(second.Stats(1).sum, 90);
    EXPECT_EQ(second.Stats(1).band, 1u);
    EXPECT_EQ(second.Stats(1).minimum, 10);
}

TEST(BandStatistics, NothingValidLeavesNoFlags) {
    BandAccumulator<short> accumulator;
    EXPECT_EQ(accumulator.Stats(3).flags, 0u);
    const short row[] = {1, 2};
    const unsigned char mask[] = {1, 1};
    accumulator.AddRow(row, mask, 0, 1, 2);
    accumulator.AddRow(row, nullptr, 0, 1, 0);
    BandAccumulator<short> other;
    other.Merge(accumulator);
    EXPECT_EQ(other.Stats(3).flags, 0u);
    EXPECT_EQ(other.Stats(3).count, 0u);
    EXPECT_EQ(other.Stats(3).band, 3u);
}

TEST(BandStatistics, RowsLongerThanAChunk) {
    const Samples<unsigned short> samples(200000, 65535);
    const auto stats = StatsOf(samples);
    EXPECT_EQ(stats.sum, 200000.0 * 65535);
    EXPECT_EQ(stats.sumOfSquares, 200000.0 * 65535 * 65535);
    EXPECT_EQ(stats.count, 200000u);
    const Samples<int> low(200000, std::numeric_limits<int>::min());
    EXPECT_EQ(StatsOf(low).sumOfSquares, 200000 * 0x1p62);
}

}  // namespace
