#include "format/LevelGeometry.h"

#include <gtest/gtest.h>

#include "core/CheckedArithmetic.h"

namespace zelm {
namespace {

TEST(LevelGeometryTest, OddEdgesHaveNoCounterpartInTheNextLevel) {
    const LevelGeometry one(1001, 513, 256, 1);
    EXPECT_EQ(one.samples, 500u);
    EXPECT_EQ(one.lines, 256u);
    const LevelGeometry two(1001, 513, 256, 2);
    EXPECT_EQ(two.samples, 250u);
    EXPECT_EQ(two.lines, 128u);
}

TEST(LevelGeometryTest, GridAndLastTilesOf1001By513) {
    const LevelGeometry one(1001, 513, 256, 1);
    EXPECT_EQ(one.tilesAcross, 2u);
    EXPECT_EQ(one.tilesDown, 1u);
    EXPECT_EQ(one.lastWidth, 244u);
    EXPECT_EQ(one.lastHeight, 256u);
    EXPECT_EQ(one.TileWidth(0), 256u);
    EXPECT_EQ(one.TileWidth(1), 244u);
}

TEST(LevelGeometryTest, TileOffsetsOf1000By777) {
    const LevelGeometry zero(1000, 777, 256, 0);
    EXPECT_EQ(zero.TileOffset(3, 3, 3), 2324736u);
    EXPECT_EQ(zero.TileOffset(1, 2, 3), 1732608u);
    EXPECT_EQ(zero.TileOffset(0, 0, 3), 0u);
}

TEST(LevelGeometryTest, LevelsShrinkToNothing) {
    const LevelGeometry six(100, 100, 256, 6);
    EXPECT_EQ(six.samples, 1u);
    EXPECT_EQ(six.tilesAcross * six.tilesDown, 1u);
    EXPECT_EQ(six.lastWidth, 1u);
    const LevelGeometry seven(100, 100, 256, 7);
    EXPECT_EQ(seven.samples, 0u);
    EXPECT_EQ(seven.tilesAcross, 0u);
    EXPECT_EQ(LevelGeometry::LevelPixels(100, 100, 6), 1u);
    EXPECT_EQ(LevelGeometry::LevelPixels(100, 100, 7), 0u);
}

TEST(LevelGeometryTest, LevelsFrom32UpHoldNoPixelsThoughTheShiftWraps) {
    EXPECT_EQ(LevelGeometry(100, 100, 256, 32).samples, 100u);
    EXPECT_EQ(LevelGeometry::LevelPixels(100, 100, 32), 0u);
    EXPECT_EQ(LevelGeometry::LevelPixels(100, 100, 0xFFFFFFFFu), 0u);
}

TEST(LevelGeometryTest, ProductsAre64Bit) {
    EXPECT_EQ(LevelGeometry::LevelPixels(65536, 65536, 0), std::uint64_t{1} << 32);
    const LevelGeometry big(1u << 20, 1u << 20, 256, 0);
    EXPECT_EQ(big.TileOffset(0, 4095, 16), (std::uint64_t{1} << 20) * 4095 * 256 * 16);
}

TEST(LevelGeometryTest, TileSizeZeroHasNoTiles) {
    const LevelGeometry none(100, 100, 0, 0);
    EXPECT_EQ(none.tilesAcross, 0u);
    EXPECT_FALSE(none.HasTile(0, 0));
}

// Every pixel belongs to one tile, and the tiles of a level fill it without gap or overlap.
TEST(LevelGeometryTest, TilesFillTheLevel) {
    for (const std::uint32_t samples : {1u, 255u, 256u, 257u, 1000u})
        for (const std::uint32_t lines : {1u, 255u, 256u, 257u, 777u}) {
            const LevelGeometry level(samples, lines, 256, 0);
            std::uint64_t next = 0;
            for (std::uint32_t y = 0; y < level.tilesDown; ++y)
                for (std::uint32_t x = 0; x < level.tilesAcross; ++x) {
                    EXPECT_EQ(level.TileOffset(x, y, 1), next);
                    next += std::uint64_t{level.TileWidth(x)} * level.TileHeight(y);
                }
            EXPECT_EQ(next, LevelGeometry::LevelPixels(samples, lines, 0));
        }
}

TEST(CheckedArithmeticTest, ProductsTellWhenTheyDoNotFit) {
    const std::uint64_t half = std::uint64_t{1} << 32;
    EXPECT_EQ(CheckedProduct({half, half - 1}), half * (half - 1));
    EXPECT_EQ(CheckedProduct({half, half}), std::nullopt);
    EXPECT_EQ(CheckedProduct({half, half, 0}), 0u);
    EXPECT_EQ(CheckedProduct({}), 1u);
}

TEST(CheckedArithmeticTest, SumsTellWhenTheyDoNotFit) {
    EXPECT_EQ(CheckedSum(1, 2), 3u);
    EXPECT_EQ(CheckedSum(~std::uint64_t{0}, 1), std::nullopt);
    EXPECT_EQ(CheckedSum(std::nullopt, 1), std::nullopt);
    EXPECT_FALSE(FitsWithin(std::nullopt, ~std::uint64_t{0}));
    EXPECT_TRUE(FitsWithin(7, 7));
    EXPECT_FALSE(FitsWithin(8, 7));
}

}  // namespace
}  // namespace zelm
