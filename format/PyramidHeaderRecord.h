// The eleven values of a header document, and what they mean by themselves.
#ifndef ZMC_FORMAT_PYRAMIDHEADERRECORD_H
#define ZMC_FORMAT_PYRAMIDHEADERRECORD_H

#include <cstdint>

#include "core/PixelVocabulary.h"
#include "format/LevelGeometry.h"

namespace zelm {

struct PyramidHeaderRecord {
    std::uint32_t versionMajor = 0;
    std::uint32_t versionMinor = 0;
    std::uint32_t bandCount = 0;
    std::uint32_t width = 0;         // of level 0, in pixels
    std::uint32_t height = 0;        // of level 0, in pixels
    std::uint32_t tileSize = 0;      // side of the square tiles, in pixels
    std::uint32_t levelMin = 0;      // first level in the file; 0 is the finest there can be
    std::uint32_t levelMax = 0;      // last level in the file, inclusive
    std::uint32_t pixelType = 0;     // code (core/PixelVocabulary.h)
    std::int32_t interleave = 0;     // code; only carried
    std::uint32_t tileOrdering = 0;  // TileOrder code

    // A tile holds one band, and its place is in a table (TileTable.h); else all bands, pixel by
    // pixel, and its place follows from its number.
    bool IsPlanar() const { return tileOrdering >= TileOrder::Morton; }

    LevelGeometry Geometry(std::uint32_t level) const { return {width, height, tileSize, level}; }
    // Bytes of all tiles of a level, in any ordering. This and the next wrap for headers beyond
    // PyramidLimits.
    std::uint64_t LevelBytes(std::uint32_t level) const {
        return LevelGeometry::LevelPixels(width, height, level) * PixelSize(pixelType) * bandCount;
    }
    // Where a level begins, from the start of the tile data: the coarsest stands first. In the
    // ordering Morton this serves to tell the end alone.
    std::uint64_t LevelStart(std::uint32_t level) const {
        std::uint64_t start = 0;
        for (std::uint64_t coarser = level + std::uint64_t{1}; coarser <= levelMax; ++coarser)
            start += LevelBytes(static_cast<std::uint32_t>(coarser));
        return start;
    }
    // Bytes of the tiles of all levels.
    std::uint64_t TileDataBytes() const {
        return levelMin > levelMax ? 0 : LevelStart(levelMin) + LevelBytes(levelMin);
    }
};

// The side of the tiles in files that are written here. Readers take any.
inline constexpr std::uint32_t kWrittenTileSize = 256;

// New files with more bands are ordered along the Morton curve: a reader of one band would have to
// skip too much in pixels of all.
inline constexpr std::uint32_t kMaxInterleavedBands = 8;

// The ordering of a new file, by its bands and the lines that its host wants in a tile.
constexpr std::uint32_t TileOrderFor(std::uint32_t bands, std::uint32_t tileLines) {
    if (bands > kMaxInterleavedBands) return TileOrder::Morton;
    return tileLines > 1 ? TileOrder::Blocked : TileOrder::Scanline;
}

}  // namespace zelm

#endif
