// The gathering procedure: how a rectangle of a level falls apart into pieces of tiles, and how the
// samples of a piece move between a tile's layout and the caller's.
//
// One procedure serves reading and writing, tiles of whole pixels and tiles of single bands, and
// all sample sizes. No sample is examined or converted: a complex sample moves as one unit.
#ifndef ZMC_PYRAMID_TILEGATHER_H
#define ZMC_PYRAMID_TILEGATHER_H

#include <algorithm>
#include <cstddef>
#include <cstdint>

#include "pyramid/LevelGeometry.h"

namespace zelm {

// A rectangle of a level, in pixels of that level. It has at least one pixel, and lies inside.
struct TileRect {
    std::uint32_t x;
    std::uint32_t y;
    std::uint32_t width;
    std::uint32_t height;
};

// What one tile holds of a rectangle.
struct TilePiece {
    std::uint32_t tileX;
    std::uint32_t tileY;
    std::uint32_t tileWidth;  // of this tile: those at the right and bottom edge are smaller
    std::uint32_t tileHeight;
    std::uint32_t firstColumn;  // of the piece in its tile
    std::uint32_t firstRow;
    std::uint32_t columns;
    std::uint32_t rows;
    std::uint32_t outColumn;  // of the piece in the rectangle
    std::uint32_t outRow;
};

// Extent of a piece along one axis.
struct TileSpan {
    std::uint32_t first;  // in the tile
    std::uint32_t count;

    TileSpan(std::uint32_t tile, std::uint32_t tileSize, std::uint32_t tileExtent,
             std::uint32_t start, std::uint32_t extent) {
        const std::uint32_t tileStart = tile * tileSize;
        first = start > tileStart ? start - tileStart : 0;
        count = std::min(tileExtent, start + extent - tileStart) - first;
    }
};

// Calls visit(const TilePiece&) for every tile that the rectangle touches, tile rows from the top,
// tiles from the left, until a call answers false; the answer is whether none did.
template <class Visit>
bool VisitPieces(const LevelGeometry& level, const TileRect& rect, Visit&& visit) {
    const std::uint32_t side = level.tileSize;
    const std::uint32_t lastX = (rect.x + rect.width - 1u) / side;
    const std::uint32_t lastY = (rect.y + rect.height - 1u) / side;
    for (std::uint32_t tileY = rect.y / side; tileY <= lastY; ++tileY) {
        const std::uint32_t tileHeight = level.TileHeight(tileY);
        const TileSpan down(tileY, side, tileHeight, rect.y, rect.height);
        for (std::uint32_t tileX = rect.x / side; tileX <= lastX; ++tileX) {
            const std::uint32_t tileWidth = level.TileWidth(tileX);
            const TileSpan across(tileX, side, tileWidth, rect.x, rect.width);
            const TilePiece piece{tileX,
                                  tileY,
                                  tileWidth,
                                  tileHeight,
                                  across.first,
                                  down.first,
                                  across.count,
                                  down.count,
                                  tileX * side + across.first - rect.x,
                                  tileY * side + down.first - rect.y};
            if (!visit(piece)) return false;
        }
    }
    return true;
}

// Where the samples of a block of pixels lie; Byte is unsigned char or const unsigned char. The
// sample of list position i starts at `data` + row * rowStep + column * pixelStep + band *
// bandStep, band being bands[i], or i itself where there is no list.
template <class Byte>
struct SampleBlock {
    Byte* data;
    std::size_t rowStep;
    std::size_t pixelStep;
    std::size_t bandStep;
    const int* bands = nullptr;

    std::size_t BandOffset(std::uint32_t i) const {
        return (bands ? static_cast<std::size_t>(bands[i]) : i) * bandStep;
    }
    // Whole pixels of `count` samples, one after the other.
    bool IsPacked(std::uint32_t count, std::size_t sampleBytes) const {
        return !bands && (count == 1 || bandStep == sampleBytes) &&
               pixelStep == count * sampleBytes;
    }
};

// Moves `bands` samples of each pixel of a block. `sampleBytes` is 1, 2, 4, 8 or 16.
void MoveSamples(const SampleBlock<const unsigned char>& from, const SampleBlock<unsigned char>& to,
                 std::uint32_t rows, std::uint32_t columns, std::uint32_t bands,
                 std::uint32_t sampleBytes);

}  // namespace zelm

#endif
