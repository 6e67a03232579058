#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <vector>

#include "pyramid/PyramidDataset.h"
#include "tests/support/ProcessorTime.h"
#include "tests/support/PyramidFileTest.h"
#include "tests/support/PyramidModel.h"

namespace zelm {
namespace {

using zmctest::MortonModel;
using zmctest::ProcessorTime;
using zmctest::PyramidDescription;

// A dataset with the table of that description, its tiles starting at `start`.
std::unique_ptr<PyramidDataset> BuildTable(const PyramidDescription& d, std::uint32_t sampleBytes,
                                           std::uint64_t start) {
    auto dataset = std::make_unique<PyramidDataset>(String("unused"));
    dataset->LevelMin = d.levelMin;
    dataset->LevelMax = d.levelMax;
    dataset->TileCursor = start;
    dataset->BuildTileTable(d.samples, d.lines, d.tile, d.tile, d.bands, sampleBytes);
    return dataset;
}

// Every tile that a level has lies where the table says, if it is asked for alone.
void ExpectSamePlaces(const PyramidDescription& d, const PyramidDataset& dataset,
                      std::uint32_t sampleBytes) {
    const LevelGeometry grid(d.samples, d.lines, d.tile, 0);
    const TileTable table{grid, d.levelMin, d.levelMax, d.bands, sampleBytes};
    const TilePlaces places(table, 1000);
    const std::uint64_t tiles = table.Tiles();
    for (std::uint32_t level = 0; level <= d.levelMax; ++level) {
        const LevelGeometry geometry(d.samples, d.lines, d.tile, level);
        for (std::uint32_t band = 0; band < d.bands; ++band)
            for (std::uint32_t y = 0; y < geometry.tilesDown; ++y)
                for (std::uint32_t x = 0; x < geometry.tilesAcross; ++x)
                    ASSERT_EQ(
                        places.At(band, level, x, y),
                        dataset.TileOffsets.data[(std::uint64_t{level} * d.bands + band) * tiles +
                                                 std::uint64_t{geometry.tilesAcross} * y + x])
                        << "level " << level << ", band " << band << ", tile " << x << ',' << y;
    }
}

// Every entry that the model sets has its value, and all others are 0.
void ExpectSameTable(const PyramidDescription& d, std::uint32_t sampleBytes) {
    const MortonModel model(d, sampleBytes, 1000);
    const auto dataset = BuildTable(d, sampleBytes, 1000);
    ASSERT_NE(dataset->TileOffsets.data, nullptr);
    ASSERT_EQ(dataset->TileOffsets.shape.elements, (d.levelMax + 1) * d.bands * model.tiles);
    EXPECT_EQ(dataset->TileCursor, model.cursor);
    for (std::uint64_t i = 0; i < dataset->TileOffsets.shape.elements; ++i) {
        const auto found = model.offsets.find(i);
        ASSERT_EQ(dataset->TileOffsets.data[i], found == model.offsets.end() ? 0 : found->second)
            << "entry " << i;
    }
    ExpectSamePlaces(d, *dataset, sampleBytes);
}

TEST(TileTableTest, PlacesTheTilesOf1024By1024) {
    PyramidDescription d;
    d.samples = d.lines = 1024;
    d.levelMax = 2;
    const auto dataset = BuildTable(d, 1, 0);
    const std::uint64_t* const zero = dataset->TileOffsets.data;
    const std::uint64_t* const one = zero + 16;
    const std::uint64_t* const two = one + 16;
    const std::vector<std::uint64_t> expected{0,      65536,  262144,  393216, 131072, 196608,
                                              458752, 524288, 589824,  720896, 917504, 1048576,
                                              786432, 851968, 1114112, 1179648};
    EXPECT_EQ(std::vector<std::uint64_t>(zero, zero + 16), expected);
    EXPECT_EQ(std::vector<std::uint64_t>(one, one + 4),
              (std::vector<std::uint64_t>{327680, 655360, 983040, 1245184}));
    EXPECT_EQ(two[0], 1310720u);
    EXPECT_EQ(dataset->TileCursor, 1376256u);
}

TEST(TileTableTest, PlacesEdgeTilesOf1000By777) {
    PyramidDescription d;
    d.samples = 1000;
    d.lines = 777;
    d.bands = 2;
    d.levelMax = 1;
    const auto dataset = BuildTable(d, 2, 500);
    EXPECT_EQ(dataset->TileCursor, 500u + 3884000);
    // Level 1's tile (1, 0) covers the tiles (2..3, 0..1) and stands behind (0, 2) of level 0.
    const std::uint64_t tiles = 16;
    const std::uint64_t behind = dataset->TileOffsets.data[2 * 4] + 256 * 256 * 2;
    EXPECT_EQ(dataset->TileOffsets.data[2 * tiles + 1], behind);
    // It is 244 wide, and the next tile follows it.
    EXPECT_EQ(dataset->TileOffsets.data[2 * 4 + 1], behind + 244 * 256 * 2);
    // Tile (3, 0) of level 0 is 232 wide; (2, 1) follows it.
    EXPECT_EQ(dataset->TileOffsets.data[4 + 2] - dataset->TileOffsets.data[3], 232u * 256 * 2);
}

TEST(TileTableTest, OneTileOnly) {
    PyramidDescription d;
    d.samples = 256;
    d.lines = 3;
    const auto dataset = BuildTable(d, 4, 77);
    EXPECT_EQ(dataset->TileOffsets.shape.elements, 1u);
    EXPECT_EQ(dataset->TileOffsets.data[0], 77u);
    EXPECT_EQ(dataset->TileCursor, 77u + 256 * 3 * 4);
}

TEST(TileTableTest, ShapeCountsAnExtentOfZeroAsOne) {
    PyramidDescription d;
    d.levelMax = 3;
    d.samples = 0;
    d.bands = 5;
    const auto noTiles = BuildTable(d, 1, 9);
    EXPECT_EQ(noTiles->TileOffsets.shape.dimensions, 2u);
    EXPECT_EQ(noTiles->TileOffsets.shape.elements, 20u);
    EXPECT_EQ(noTiles->TileCursor, 9u);
    d.bands = 0;
    EXPECT_EQ(BuildTable(d, 1, 9)->TileOffsets.shape.dimensions, 1u);
    d.samples = 256;
    const auto noBands = BuildTable(d, 1, 9);
    EXPECT_EQ(noBands->TileOffsets.shape.dimensions, 3u);
    EXPECT_EQ(noBands->TileCursor, 9u);
}

TEST(TileTableTest, LevelsAboveTheTileSizeHaveNoAddresses) {
    PyramidDescription d;
    d.samples = d.lines = 1024;
    d.levelMax = 9;
    ExpectSameTable(d, 1);
    const auto dataset = BuildTable(d, 1, 1000);
    EXPECT_NE(dataset->TileOffsets.data[8 * 16], 0u);
    EXPECT_EQ(dataset->TileOffsets.data[9 * 16], 0u);
}

TEST(TileTableTest, GridsBeyondTheCurveLeaveTheTableEmpty) {
    PyramidDescription d;
    d.tile = 1;
    d.lines = 1;
    d.samples = 65537;
    EXPECT_EQ(BuildTable(d, 1, 5)->TileOffsets.data, nullptr);
    d.samples = 65536;
    EXPECT_NE(BuildTable(d, 1, 5)->TileOffsets.data, nullptr);
    d.tile = 0;
    EXPECT_EQ(BuildTable(d, 1, 5)->TileOffsets.data, nullptr);
    d.tile = 256;
    d.bands = 0xFFFFFFFF;
    EXPECT_EQ(BuildTable(d, 1, 5)->TileOffsets.data, nullptr);
}

TEST(TileTableTest, AWalkThatHasFewTilesIsShortWhateverItsShape) {
    PyramidDescription d;
    d.tile = 1;
    d.samples = 1;
    d.lines = 65536;
    const ProcessorTime time;
    const auto dataset = BuildTable(d, 1, 0);
    EXPECT_EQ(dataset->TileOffsets.data[65535], 65535u);
    EXPECT_LT(time.Seconds(), 5);  // trying every code would take minutes
}

RC_GTEST_PROP(TileTableProperty, EqualsTheWalkByTheLetter, ()) {
    PyramidDescription d;
    d.tile = *rc::gen::inRange(1u, 40u);
    d.samples = *rc::gen::inRange(1u, 12u * d.tile);
    d.lines = *rc::gen::inRange(1u, 12u * d.tile);
    d.bands = *rc::gen::inRange(1u, 4u);
    d.levelMin = *rc::gen::inRange(0u, 4u);
    d.levelMax = d.levelMin + *rc::gen::inRange(0u, 6u);
    ExpectSameTable(d, *rc::gen::element(1u, 2u, 4u, 8u, 16u));
}

// All small grids with all small levels, with tile sizes that 2^L divides and that it does not.
TEST(TileTableTest, EqualsTheWalkOnAllSmallGrids) {
    for (const std::uint32_t tile : {1u, 2u, 3u, 4u, 7u, 8u, 12u})
        for (std::uint32_t samples = 1; samples <= 5 * tile; samples += (tile > 4 ? 3 : 1))
            for (std::uint32_t lines = 1; lines <= 5 * tile; lines += (tile > 4 ? 4 : 1))
                for (const std::uint32_t levelMin : {0u, 1u, 2u}) {
                    PyramidDescription d;
                    d.tile = tile;
                    d.samples = samples;
                    d.lines = lines;
                    d.levelMin = levelMin;
                    d.levelMax = 5;
                    d.bands = 2;
                    ExpectSameTable(d, 2);
                    if (HasFatalFailure()) return;
                }
}

TEST(TileTableTest, EqualsTheWalkOnLongThinGrids) {
    for (const auto& [samples, lines] : std::vector<std::pair<std::uint32_t, std::uint32_t>>{
             {1, 200}, {200, 1}, {3, 77}, {130, 5}, {64, 64}, {65, 64}}) {
        PyramidDescription d;
        d.tile = 4;
        d.samples = samples * 4;
        d.lines = lines * 4 - 1;
        d.levelMax = 7;
        ExpectSameTable(d, 1);
    }
}

}  // namespace
}  // namespace zelm
