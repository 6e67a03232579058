#include <gtest/gtest.h>

#include "core/ElementTypes.h"
#include "raster/RasterBandHistogram.h"
#include "raster/RasterBandStats.h"

namespace zelm {
namespace {

template <class T>
void ExpectDefaults() {
    const RasterBandStats<T> stats;
    EXPECT_EQ(stats.band, 0u);
    EXPECT_EQ(stats.count, 0u);
    EXPECT_EQ(stats.flags, 0u);
    EXPECT_EQ(stats.minimum, T{});
    EXPECT_EQ(stats.maximum, T{});
    EXPECT_EQ(stats.mean, 0.0);
    EXPECT_EQ(stats.rootMeanSquare, 0.0);
    EXPECT_TRUE(stats.sumXY.owned && stats.covariance.owned);
    EXPECT_EQ(stats.sumXY.shape.elements, 0u);
    EXPECT_EQ(stats.covariance.shape.elements, 0u);
    const RasterBandHistogram<T> histogram;
    EXPECT_EQ(histogram.binSize, 0.0);
    EXPECT_EQ(histogram.binCount, 0u);
    EXPECT_TRUE(histogram.counts.owned);
    EXPECT_EQ(histogram.counts.shape.elements, 0u);
    EXPECT_EQ(histogram.minimum, T{});
    EXPECT_EQ(histogram.source, 0u);
    EXPECT_EQ(histogram.type, 0u);
    EXPECT_EQ(histogram.level, 0u);
}

TEST(BandRecords, DefaultsForEveryElementType) {
#define ZMC_X(type, name, code) ExpectDefaults<type>();
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
}

TEST(BandRecords, StatsFlagsMakeUpTheMask) {
    EXPECT_EQ(StatsFlag::Minimum | StatsFlag::Maximum | StatsFlag::Mean |
                  StatsFlag::StandardDeviation | StatsFlag::Sum | StatsFlag::SumOfSquares |
                  StatsFlag::RootMeanSquare,
              StatsFlag::All);
    EXPECT_EQ(StatsFlag::All, 127u);
}

template <class Copier>
void ExpectOwnCounts(Copier copyOf) {
    RasterBandHistogram<float> source;
    source.band = 2;
    source.binCount = 2;
    source.type = 8;
    source.level = 3;
    source.counts.Append(10);
    source.counts.Append(20);
    RasterBandHistogram<float> copy = copyOf(source);
    EXPECT_EQ(copy.band, 2u);
    EXPECT_EQ(copy.type, 8u);
    EXPECT_EQ(copy.level, 3u);
    ASSERT_EQ(copy.counts.shape.elements, 2u);
    copy.counts.data[0] = 99;
    EXPECT_EQ(source.counts.data[0], 10u);
}

TEST(BandRecords, CopiesHoldArraysOfTheirOwn) {
    ExpectOwnCounts([](const RasterBandHistogram<float>& source) {
        return RasterBandHistogram<float>(source);
    });
    ExpectOwnCounts([](const RasterBandHistogram<float>& source) {
        RasterBandHistogram<float> copy;
        copy = source;
        return copy;
    });
}

TEST(BandRecords, StatsCopyEveryField) {
    RasterBandStats<short> source;
    source.band = 1;
    source.count = std::uint64_t{1} << 40;
    source.flags = 127;
    source.minimum = -3;
    source.maximum = 4;
    source.mean = 1;
    source.standardDeviation = 2;
    source.sum = 3;
    source.sumOfSquares = 4;
    source.rootMeanSquare = 5;
    source.sumXY.Append(1.5);
    source.covariance.Append(2.5);
    RasterBandStats<short> copy;
    copy = source;
    EXPECT_EQ(copy.count, source.count);
    EXPECT_EQ(copy.flags, 127u);
    EXPECT_EQ(copy.minimum, -3);
    EXPECT_EQ(copy.maximum, 4);
    EXPECT_EQ(copy.mean + copy.standardDeviation + copy.sum, 6.0);
    EXPECT_EQ(copy.sumOfSquares + copy.rootMeanSquare, 9.0);
    copy.sumXY.data[0] = 0;
    copy.covariance.data[0] = 0;
    EXPECT_EQ(source.sumXY.data[0], 1.5);
    EXPECT_EQ(source.covariance.data[0], 2.5);
}

TEST(BandRecords, TravelInArrays) {
    Array<RasterBandHistogram<unsigned char>> records;
    RasterBandHistogram<unsigned char> record;
    record.counts.Append(7);
    for (std::uint32_t band = 0; band < 3; ++band) {
        record.band = band;
        ASSERT_TRUE(records.Append(record));
    }
    EXPECT_EQ(records.data[2].band, 2u);
    EXPECT_EQ(records.data[0].counts.data[0], 7u);
}

}  // namespace
}  // namespace zelm
