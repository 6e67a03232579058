// LevelGeometry: the size of one level, its tile grid, and where a tile lies in it.
//
// Pure arithmetic: no file, no table. Level 0 is the full image, and every level has half the
// columns and rows of the one before, truncated. The formulas are the file format
// (docs/format.md). Sizes are unsigned 32-bit and wrap as such; offsets and products of sizes are
// 64-bit. Nothing throws, and any number of threads may use one.
//
//     LevelGeometry level(1000, 600, 256, 1);   // 500 x 300 pixels in 2 x 2 tiles
//     level.Tile(1, 1);                         // {256, 256, 244, 44}
#ifndef ZMC_FORMAT_LEVELGEOMETRY_H
#define ZMC_FORMAT_LEVELGEOMETRY_H

#include <algorithm>
#include <cstdint>

#include "format/Rectangle.h"

namespace zelm {

struct LevelGeometry {
    // Levels from here up count no bytes and hold no pixels.
    static constexpr std::uint32_t kLevelsWithPixels = 32;

    std::uint32_t tileSize = 0;     // side of a tile
    std::uint32_t samples = 0;      // width of the level
    std::uint32_t lines = 0;        // height of the level
    std::uint32_t tilesAcross = 0;  // 0 for a tile size of 0
    std::uint32_t tilesDown = 0;
    std::uint32_t lastWidth = 0;   // width of the last tile column
    std::uint32_t lastHeight = 0;  // height of the last tile row

    // From the size of level 0. The shift takes its count modulo 32, so that level 32 looks like
    // level 0: LevelPixels tells which levels hold anything.
    constexpr LevelGeometry(std::uint32_t samples0, std::uint32_t lines0, std::uint32_t tileSide,
                            std::uint32_t level)
        : tileSize(tileSide),
          samples(Shifted(samples0, level)),
          lines(Shifted(lines0, level)),
          tilesAcross(TilesOver(samples, tileSide)),
          tilesDown(TilesOver(lines, tileSide)),
          lastWidth(samples + (1u - tilesAcross) * tileSide),
          lastHeight(lines + (1u - tilesDown) * tileSide) {}

    // Size of the tiles of a column, or of a row, which the grid has.
    constexpr std::uint32_t TileWidth(std::uint32_t tileX) const {
        return tileX == tilesAcross - 1u ? lastWidth : tileSize;
    }
    constexpr std::uint32_t TileHeight(std::uint32_t tileY) const {
        return tileY == tilesDown - 1u ? lastHeight : tileSize;
    }
    // All pixels of the level.
    constexpr Rectangle Whole() const { return {0, 0, samples, lines}; }
    // The pixels of a tile, which the grid has.
    constexpr Rectangle Tile(std::uint32_t tileX, std::uint32_t tileY) const {
        const std::uint32_t x = tileX * tileSize, y = tileY * tileSize;
        return {x, y, std::min(tileSize, samples - x), std::min(tileSize, lines - y)};
    }
    // Whether the grid has this tile. Columns and rows of tiles count from 0.
    constexpr bool HasTile(std::uint32_t tileX, std::uint32_t tileY) const {
        return tileX < tilesAcross && tileY < tilesDown;
    }

    // Offset of a tile from the start of its level, for tiles that hold all bands and lie row by
    // row. `pixelBytes` is the size of a whole pixel.
    constexpr std::uint64_t TileOffset(std::uint32_t tileX, std::uint32_t tileY,
                                       std::uint64_t pixelBytes) const {
        const std::uint64_t side = tileSize;
        const std::uint64_t rowStart = samples * (tileY * side) * pixelBytes;
        const std::uint64_t height = tileY < tilesDown - 1u ? tileSize : lastHeight;
        return rowStart + tileX * side * height * pixelBytes;
    }

    // Pixels that a level occupies in a file.
    static constexpr std::uint64_t LevelPixels(std::uint32_t samples0, std::uint32_t lines0,
                                               std::uint32_t level) {
        return std::uint64_t{Extent(samples0, level)} * Extent(lines0, level);
    }
    // Columns, or rows, that a level has to show of `extent` in level 0: none from level 32 on.
    static constexpr std::uint32_t Extent(std::uint32_t extent, std::uint32_t level) {
        return level < kLevelsWithPixels ? Shifted(extent, level) : 0;
    }
    // The same with levels counted modulo 32: what the module's readers tell.
    static constexpr std::uint32_t Shifted(std::uint32_t extent, std::uint32_t level) {
        return extent >> (level & 31u);
    }

private:
    static constexpr std::uint32_t TilesOver(std::uint32_t extent, std::uint32_t side) {
        return side == 0 ? 0 : (extent + side - 1u) / side;
    }
};

}  // namespace zelm

#endif
