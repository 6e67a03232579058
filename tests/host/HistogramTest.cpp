#include "host/statistics/Histogram.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <numeric>
#include <random>
#include <vector>

#include "host/base/Int128.h"
#include "host/statistics/ValueCounter.h"

namespace {

using zmchost::HistogramAccumulator;
using zmchost::HistogramBins;
using zmchost::ValueCounter;

template <class T>
std::vector<T> AnySamples(std::uint32_t seed, bool wild) {
    std::mt19937_64 random(seed);
    std::vector<T> samples(1 + random() % 500);
    for (T& sample : samples) {
        if constexpr (std::is_floating_point_v<T>)
            sample = std::ldexp(static_cast<T>(static_cast<std::int64_t>(random())),
                                wild ? static_cast<int>(random() % 200) - 160 : -63);
        else
            sample = static_cast<T>(wild ? random() : random() % 1000);
    }
    return samples;
}

// Bin i of an integer type holds what lies in [minimum + i * w, minimum + (i + 1) * w), with
// w = (maximum - minimum + 1) / bins; compared without a division.
template <class T>
bool InBin(T value, T minimum, T maximum, std::uint32_t bins, std::size_t bin) {
    using zmchost::Int128;
    const Int128 scaled = (Int128{value} - minimum) * bins;
    const Int128 width = Int128{maximum} - minimum + 1;
    const auto i = static_cast<Int128>(bin);
    return scaled >= i * width && scaled < (i + 1) * width;
}

template <class T>
void CheckCounts(std::uint32_t seed, bool wild, std::uint32_t binCount) {
    const auto samples = AnySamples<T>(seed, wild);
    const T minimum = *std::min_element(samples.begin(), samples.end());
    const T maximum = *std::max_element(samples.begin(), samples.end());
    HistogramAccumulator<T> whole{HistogramBins<T>(minimum, maximum, binCount)};
    whole.AddRow(samples.data(), nullptr, 0, 1, static_cast<std::uint32_t>(samples.size()));
    const auto record = whole.Histogram(4);
    ASSERT_EQ(record.binCount, binCount);
    ASSERT_EQ(record.band, 4u);
    ASSERT_EQ(std::accumulate(record.counts.data, record.counts.data + binCount, std::uint64_t{0}),
              samples.size());
    for (std::uint32_t bin = 0; bin < binCount; ++bin) {
        const auto inside = [&](T value) {
            if constexpr (std::is_integral_v<T>) {
                return InBin(value, minimum, maximum, binCount, bin);
            } else {
                // A few units of the last place decide at the borders; they do not matter here.
                const long double width = static_cast<long double>(maximum) - minimum;
                const long double at =
                    width > 0 ? (static_cast<long double>(value) - minimum) / width * binCount : 0;
                return bin == std::min<std::uint32_t>(
                                  binCount - 1, static_cast<std::uint32_t>(at * (1 + 4e-15L)));
            }
        };
        const auto expected =
            static_cast<std::uint64_t>(std::count_if(samples.begin(), samples.end(), inside));
        if constexpr (std::is_integral_v<T>)
            ASSERT_EQ(record.counts.data[bin], expected) << bin;
        else
            ASSERT_LE(record.counts.data[bin], expected + 1) << bin;
    }
}

// Calls check(std::type_identity<T>{}) for every type with an order, or with a ValueCounter.
template <class Check>
void ForOrderedTypes(Check check) {
    const auto visit = [&]<class T>(std::type_identity<T> type) {
        if constexpr (!zelm::kIsComplex<T>) check(type);
    };
#define ZMC_X(type, name, code) visit(std::type_identity<type>{});
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
}
template <class Check>
void ForCountedTypes(Check check) {
    ForOrderedTypes([&]<class T>(std::type_identity<T> type) {
        if constexpr (zmchost::kCountsEveryValue<T>) check(type);
    });
}

RC_GTEST_PROP(Histogram, CountsAreThoseOfThePlainDefinition,
              (std::uint16_t seed, bool wild, std::uint8_t bins)) {
    ForOrderedTypes([&]<class T>(std::type_identity<T>) { CheckCounts<T>(seed, wild, bins + 1u); });
}

template <class T>
void CheckMonotone(std::uint32_t seed) {
    auto samples = AnySamples<T>(seed, true);
    std::sort(samples.begin(), samples.end());
    const HistogramBins<T> bins(samples.front(), samples.back());
    std::uint32_t last = 0;
    for (const T sample : samples) {
        const std::uint32_t bin = bins.Index(sample);
        RC_ASSERT(bin >= last && bin < bins.Count());
        last = bin;
    }
    RC_ASSERT(bins.Index(samples.front()) == 0);
    RC_ASSERT(samples.front() == samples.back() || last > 0);
}

RC_GTEST_PROP(Histogram, LargerValuesLieInNoLowerBin, (std::uint16_t seed)) {
    CheckMonotone<float>(seed);
    CheckMonotone<double>(seed);
    CheckMonotone<std::int64_t>(seed);
    CheckMonotone<std::uint64_t>(seed);
    CheckMonotone<int>(seed);
}

// One pass with a table of values finds what the two passes find.
template <class T>
void CheckValueCounter(std::uint32_t seed, bool wild) {
    const auto samples = AnySamples<T>(seed, wild);
    std::vector<unsigned char> mask(samples.size());
    for (std::size_t i = 0; i < mask.size(); ++i) mask[i] = static_cast<unsigned char>(i * 7 % 5);
    mask[0] = 2;
    const std::uint32_t half = static_cast<std::uint32_t>(samples.size() / 2);
    const std::uint32_t rest = static_cast<std::uint32_t>(samples.size()) - half;
    ValueCounter<T> counter;
    ValueCounter<T> other;
    counter.AddRow(samples.data(), mask.data(), 0, 1, half);
    other.AddRow(samples.data() + half, mask.data() + half, 0, 1, rest);
    counter.Merge(other);
    zmchost::BandAccumulator<T> statistics;
    statistics.AddRow(samples.data(), mask.data(), 0, 1, half + rest);
    const auto expected = statistics.Stats(0);
    const auto found = counter.Statistics().Stats(0);
    RC_ASSERT(found.count == expected.count);
    RC_ASSERT(found.minimum == expected.minimum);
    RC_ASSERT(found.maximum == expected.maximum);
    RC_ASSERT(found.standardDeviation == expected.standardDeviation);
    RC_ASSERT(found.sumOfSquares == expected.sumOfSquares);
    HistogramAccumulator<T> histogram(
        HistogramBins<T>::ForBand(expected.minimum, expected.maximum));
    histogram.AddRow(samples.data(), mask.data(), 0, 1, half + rest);
    RC_ASSERT(counter.Histogram().Counts() == histogram.Counts());
}

RC_GTEST_PROP(Histogram, OnePassFindsWhatTwoFind, (std::uint16_t seed, bool wild)) {
    ForCountedTypes([&]<class T>(std::type_identity<T>) { CheckValueCounter<T>(seed, wild); });
}

TEST(Histogram, BytesHaveOneBinPerValue) {
    ValueCounter<unsigned char> counter;
    const unsigned char row[] = {0, 9, 255, 255, 7, 9};  // two bands
    counter.AddRow(row, nullptr, 0, 2, 3);
    const auto record = counter.Histogram().Histogram(0);
    EXPECT_EQ(record.binCount, 256u);
    EXPECT_EQ(record.binSize, 1);
    EXPECT_EQ(record.minimum, 0);
    EXPECT_EQ(record.maximum, 255);
    EXPECT_EQ(record.counts.data[0], 1u);
    EXPECT_EQ(record.counts.data[255], 1u);
    EXPECT_EQ(record.counts.data[7], 1u);
    EXPECT_EQ(record.counts.data[9], 0u);
    EXPECT_EQ(record.source, zelm::HistogramSource::ORVA);
    EXPECT_EQ(record.level, 0u);
}

TEST(Histogram, SignedBytesHaveOneBinPerValue) {
    ValueCounter<char> counter;
    const char row[] = {-128, 127, 0, 0};
    counter.AddRow(row, nullptr, 0, 1, 4);
    const auto record = counter.Histogram().Histogram(0);
    EXPECT_EQ(record.minimum, -128);
    EXPECT_EQ(record.maximum, 127);
    EXPECT_EQ(record.counts.data[0], 1u);
    EXPECT_EQ(record.counts.data[128], 2u);
    EXPECT_EQ(record.counts.data[255], 1u);
    EXPECT_EQ(counter.Count(0), 2u);
    EXPECT_EQ(counter.Count(-128), 1u);
}

template <class T>
void ExpectConstantIsCounted(T value) {
    HistogramAccumulator<T> histogram(HistogramBins<T>::ForBand(value, value));
    histogram.AddRepeated(value, 12);
    const auto record = histogram.Histogram(0);
    EXPECT_EQ(record.binCount, 256u);
    EXPECT_GT(record.binSize, 0);
    EXPECT_TRUE(std::isfinite(record.binSize));
    if (sizeof(T) > 1) {
        EXPECT_EQ(record.counts.data[0], 12u);
    }
    EXPECT_EQ(std::accumulate(record.counts.data, record.counts.data + 256, std::uint64_t{0}), 12u);
}

TEST(Histogram, ConstantBandsAreCountedInTheFirstBin) {
    ForOrderedTypes([]<class T>(std::type_identity<T>) {
        ExpectConstantIsCounted<T>(T(0));
        ExpectConstantIsCounted<T>(std::numeric_limits<T>::max());
        ExpectConstantIsCounted<T>(std::numeric_limits<T>::lowest());
    });
}

TEST(Histogram, WidestRanges) {
    constexpr double top = std::numeric_limits<double>::max();
    const HistogramBins<double> doubles(-top, top);
    EXPECT_EQ(doubles.Index(-top), 0u);
    EXPECT_EQ(doubles.Index(0), 128u);
    EXPECT_EQ(doubles.Index(top), 255u);
    EXPECT_EQ(doubles.Size(), top / 128);
    const HistogramBins<std::uint64_t> longs(0, ~std::uint64_t{0});
    EXPECT_EQ(longs.Size(), 0x1p56);
    EXPECT_EQ(longs.Index((std::uint64_t{1} << 56) - 1), 0u);
    EXPECT_EQ(longs.Index(std::uint64_t{1} << 56), 1u);
    EXPECT_EQ(longs.Index(~std::uint64_t{0}), 255u);
    constexpr double tiny = std::numeric_limits<double>::denorm_min();
    const HistogramBins<double> narrow(0, 255 * tiny);
    EXPECT_EQ(narrow.Index(0), 0u);
    EXPECT_EQ(narrow.Index(255 * tiny), 255u);
    EXPECT_EQ(narrow.Index(128 * tiny), 128u);
}

TEST(Histogram, WhatLiesOutsideIsNotCounted) {
    HistogramAccumulator<float> histogram(HistogramBins<float>(0, 10, 5));
    const float row[] = {-1, 0, 10, 10.5F, NAN, INFINITY, 5};
    histogram.AddRow(row, nullptr, 0, 1, 7);
    EXPECT_EQ(histogram.Counts(), (std::vector<std::uint64_t>{1, 0, 1, 0, 1}));
    EXPECT_EQ(HistogramBins<float>(0, 10, 5).Index(NAN), HistogramBins<float>::kOutside);
    EXPECT_EQ(HistogramBins<int>(5, 6).Index(4), HistogramBins<int>::kOutside);
    using C = zelm::Complex<float>;
    EXPECT_EQ(HistogramBins<C>(C(0, 0), C(9, 9)).Index(C(1, 1)), HistogramBins<C>::kOutside);
}

TEST(Histogram, MergingAddsCounts) {
    const HistogramBins<int> bins(0, 99, 10);
    HistogramAccumulator<int> a(bins);
    HistogramAccumulator<int> b(bins);
    a.AddRepeated(5, 3);
    b.AddRepeated(9, 4);
    b.AddRepeated(99, 1);
    a.Merge(b);
    EXPECT_EQ(a.Counts()[0], 7u);
    EXPECT_EQ(a.Counts()[9], 1u);
}

TEST(Histogram, NothingValidGivesAnEmptyHistogram) {
    const auto record = ValueCounter<unsigned short>().Histogram().Histogram(2);
    EXPECT_EQ(record.binCount, 256u);
    EXPECT_EQ(record.counts.data[0], 0u);
    EXPECT_EQ(record.minimum, 0);
    EXPECT_EQ(record.maximum, 0);
}

}  // namespace
