// Copies of rectangles between a raster in memory and a tile buffer.
//
// A copy is three loops, over lines, bands and samples, each with a step on either side. Loops that
// continue one another are one move; what is left is moved sample by sample, several bands at a
// time. The work depends on the size of a sample alone: 1, 2, 4, 8 or 16 bytes.
//
// Both sides have the same interleave. The tile has the width and height of the window, without
// gaps, and holds the bands of a list, in that order, in place of the raster's; a band that a list
// names twice takes, in the raster, the values that come last. Places in the raster and in the tile
// are counted in 64 bits. Neither buffer needs to be aligned.
//
// Nothing is clipped: the window lies within the raster and the bands exist, which assertions hold
// in debug builds. A window without area, or an empty band list, copies nothing, and its buffers
// may be null. Nothing is allocated or thrown. Buffers are borrowed and must not overlap; calls
// that touch different memory may run at the same time.
#ifndef ZMC_RASTER_TILECOPY_H
#define ZMC_RASTER_TILECOPY_H

#include <cstddef>
#include <cstdint>

namespace zelm {

// Size and interleave of a raster in memory. Sizes count from 1; `interleave` is one of the four
// codes, and with None `bands` takes no part.
struct RasterLayout {
    std::int32_t interleave;
    std::uint32_t samples;
    std::uint32_t lines;
    std::uint32_t bands;
};

// The rectangle of a tile in samples and lines: the first of each, from 0, and how many.
struct TileWindow {
    std::int32_t x;
    std::int32_t y;
    std::uint32_t width;
    std::uint32_t height;
};

// The bands of a tile, borrowed and numbered from 0. With interleave None the list takes no part
// and may be null: there is one band.
struct TileBands {
    const int* numbers;
    std::uint32_t count;
};

void CopyTileFromRaster(const RasterLayout& layout, const TileWindow& window, TileBands bands,
                        std::size_t sampleSize, const void* raster, void* tile);

void CopyTileToRaster(const RasterLayout& layout, const TileWindow& window, TileBands bands,
                      std::size_t sampleSize, void* raster, const void* tile);

}  // namespace zelm

#endif
