// Several threads on one open pyramid, and what they gather.
#include "host/raster/RasterLanes.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cmath>
#include <filesystem>
#include <limits>
#include <map>
#include <mutex>
#include <optional>
#include <set>
#include <stdexcept>
#include <utility>

#include "host/build/PyramidBuilder.h"
#include "host/build/SampleGathering.h"
#include "host/statistics/BandStatistics.h"
#include "tests/support/FailureOf.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

using zmctest::FailureOf;
using zmctest::MemorySource;
using zmctest::ScratchDirectory;
using zmctest::TestModule;

class Lanes : public testing::Test {
protected:
    ScratchDirectory folder;
    std::optional<MemorySource<short>> source;

    Raster Built(Ordering ordering = Ordering::Auto, std::uint32_t bands = 3) {
        source.emplace(400u, 300u, bands);
        source->FillWithNoise(1);
        BuildOptions options;
        options.ordering = ordering;
        options.overwrite = true;
        PyramidBuilder(TestModule()).Build(*source, folder / "a.zmc", options);
        return Raster::Open(TestModule(), folder / "a.zmc");
    }
};

TEST_F(Lanes, EachPieceIsTakenOnceAndEachLaneTakesThemInOrder) {
    Raster raster = Built();
    for (const std::uint32_t threads : {1u, 2u, 5u}) {
        RasterLanes lanes(raster, threads, 0, 0);
        ASSERT_EQ(lanes.Count(), threads);
        std::vector<std::vector<std::uint64_t>> taken(threads);
        lanes.Run(1000,
                  [&](std::uint32_t lane, std::uint64_t piece) { taken[lane].push_back(piece); });
        std::set<std::uint64_t> all;
        std::size_t count = 0;
        for (const auto& lane : taken) {
            EXPECT_TRUE(std::is_sorted(lane.begin(), lane.end()));
            all.insert(lane.begin(), lane.end());
            count += lane.size();
        }
        EXPECT_EQ(count, 1000u);
        EXPECT_EQ(all.size(), 1000u);
    }
}

TEST_F(Lanes, AreAsManyAsHoldWhatTheyMay) {
    Raster raster = Built();
    EXPECT_EQ(RasterLanes(raster, 8, 100, 350).Count(), 3u);
    EXPECT_EQ(RasterLanes(raster, 8, 100, 50).Count(), 1u);
    EXPECT_EQ(RasterLanes(raster, 2, 1, 50).Count(), 2u);
    EXPECT_GE(RasterLanes(raster, 0, 0, 0).Count(), 1u);
}

TEST_F(Lanes, WhatOneThrowsEndsAllAndComesOut) {
    Raster raster = Built();
    RasterLanes lanes(raster, 3, 0, 0);
    std::atomic<int> calls = 0;
    const auto work = [&](std::uint32_t, std::uint64_t piece) {
        ++calls;
        if (piece == 20) throw std::runtime_error("enough");
    };
    EXPECT_THROW(lanes.Run(1000000000, work), std::runtime_error);
    EXPECT_LT(calls, 1000000000);
}

TEST_F(Lanes, BlocksCoverALevelOnce) {
    Raster raster = Built();
    for (const std::uint32_t side : {1u, 7u, 256u, 400u, 4294967295u}) {
        RasterLanes lanes(raster, 2, 0, 0);
        std::mutex mutex;
        std::vector<int> seen(std::size_t{400} * 300);
        lanes.RunBlocks(0, side, [&](std::uint32_t, const Window& block) {
            EXPECT_EQ(block.x % side, 0u);
            EXPECT_EQ(block.y % side, 0u);
            EXPECT_EQ(block.width, std::min(side, 400 - block.x));
            EXPECT_EQ(block.height, std::min(side, 300 - block.y));
            const std::lock_guard lock(mutex);
            for (std::uint32_t y = 0; y < block.height; ++y)
                for (std::uint32_t x = 0; x < block.width; ++x)
                    ++seen[(std::size_t{block.y} + y) * 400 + block.x + x];
        });
        EXPECT_EQ(std::count(seen.begin(), seen.end(), 1), 400 * 300) << side;
    }
}

TEST_F(Lanes, ReadTheOpenFileWhateverHasItsName) {
    Raster raster = Built();
    raster.SetNoDataValues({{1, 3.0}});
    const std::vector<short> before = raster.Read<short>(0, {0, 0, 400, 300});
    std::filesystem::rename(folder / "a.zmc", folder / "gone.zmc");
    zmctest::WriteText(folder / "a.zmc", "no pyramid");
    Raster other = raster.Another();
    EXPECT_EQ(other.Read<short>(0, {0, 0, 400, 300}), before);
    EXPECT_EQ(other.NoDataValue(1), 3.0);
    EXPECT_EQ(other.NoDataValue(0), std::nullopt);
}

TEST_F(Lanes, MemoryHasNone) {
    short samples[4] = {};
    Raster raster = Raster::OfMemory(TestModule(), samples, MemorySource<short>(2, 2, 1).props);
    EXPECT_THAT(FailureOf([&] { raster.Another(); }), testing::HasSubstr("it has no file"));
}

// Whatever the order of tiles and the threads are, as by one plain loop over the samples.
TEST_F(Lanes, GatherWhatAPlainLoopFinds) {
    for (const auto& [ordering, count] :
         {std::pair(Ordering::Scanline, 3u), std::pair(Ordering::Blocked, 3u),
          std::pair(Ordering::Morton, 9u)}) {
        Raster raster = Built(ordering, count);
        const std::vector<short>& all = source->pixels;
        const short hole = all[5];
        raster.SetNoDataValues({{2, static_cast<double>(hole)}});
        const std::uint32_t bands[] = {2, 0};
        BandAccumulator<short> expected[2];
        for (std::size_t pixel = 0; pixel < all.size(); pixel += count) {
            if (all[pixel + 2] != hole) expected[0].AddRepeated(all[pixel + 2], 1);
            expected[1].AddRepeated(all[pixel], 1);
        }
        for (const std::uint32_t threads : {1u, 3u}) {
            std::vector<BandAccumulator<short>> found(2);
            std::uint64_t pixels = 0;
            GatherSamples<short>(raster, threads, 100, bands, found,
                                 [&](std::uint64_t further) { pixels += further; });
            EXPECT_EQ(pixels, 400u * 300u);
            for (std::size_t i = 0; i < 2; ++i) {
                const auto a = found[i].Stats(bands[i]), b = expected[i].Stats(bands[i]);
                EXPECT_EQ(found[i].Count(), expected[i].Count());
                EXPECT_EQ(a.minimum, b.minimum);
                EXPECT_EQ(a.maximum, b.maximum);
                EXPECT_EQ(a.sum, b.sum);
                EXPECT_EQ(a.sumOfSquares, b.sumOfSquares);
            }
        }
    }
}

TEST_F(Lanes, GatheringEndsWhereItIsToldTo) {
    Raster raster = Built();
    std::vector<BandAccumulator<short>> found(3);
    const auto stop = [](std::uint64_t) { throw std::runtime_error("stop"); };
    EXPECT_THROW(GatherSamples<short>(raster, 2, 100, raster.AllBands(), found, stop),
                 std::runtime_error);
}

TEST(RasterMasks, AreThoseOfTheRuleOfEachBand) {
    const ScratchDirectory folder;
    MemorySource<float> source(37, 5, 3);
    for (std::size_t i = 0; i < source.pixels.size(); ++i)
        source.pixels[i] =
            i % 11 == 0 ? std::numeric_limits<float>::infinity() : static_cast<float>(i % 4);
    PyramidBuilder(TestModule()).Build(source, folder / "a.zmc");
    Raster raster = Raster::Open(TestModule(), folder / "a.zmc");
    using Values = std::map<std::uint32_t, double>;
    for (const Values& values : {Values{}, Values{{0, 2.0}, {1, 2.0}, {2, 2.0}},
                                 Values{{0, 2.0}, {2, 2.0}}, Values{{0, 1.0}, {1, 3.0}}}) {
        raster.SetNoDataValues(values);
        std::vector<float> pixels(source.pixels.size());
        std::vector<unsigned char> mask(pixels.size(), 0xA5);
        raster.Read(0, {0, 0, 37, 5}, raster.AllBands(), pixels.data(), mask.data());
        for (std::size_t i = 0; i < pixels.size(); ++i) {
            const auto value = values.find(static_cast<std::uint32_t>(i % 3));
            const bool marked = std::isinf(source.pixels[i]) ||
                                (value != values.end() && source.pixels[i] == value->second);
            EXPECT_EQ(mask[i], 0xA4 | (marked ? 1 : 0)) << i;
        }
    }
}

}  // namespace
}  // namespace zmchost
