#include "raster/TileCopy.h"

#include <algorithm>
#include <bit>
#include <cassert>
#include <cstring>
#include <type_traits>

#include "core/PixelVocabulary.h"

namespace zelm {
namespace {

// Bytes from which neighbouring bands of one pixel are moved as a block, not sample by sample.
constexpr std::size_t kBlockBytes = 64;
// Bands that one pass over a line of pixels moves.
constexpr std::uint32_t kPassBands = 4;

// The two directions.
struct ToTile {
    using Raster = const unsigned char*;
    using Tile = unsigned char*;
    static void Move(Raster raster, Tile tile, std::size_t bytes) {
        std::memcpy(tile, raster, bytes);
    }
};
struct ToRaster {
    using Raster = unsigned char*;
    using Tile = const unsigned char*;
    static void Move(Raster raster, Tile tile, std::size_t bytes) {
        std::memcpy(raster, tile, bytes);
    }
};

// One of the loops that a copy is made of: how often, and how many bytes further on either side.
struct Loop {
    std::size_t count;
    std::size_t inRaster;
    std::size_t inTile;

    bool Continues(const Loop& inner) const {
        return inRaster == inner.count * inner.inRaster && inTile == inner.count * inner.inTile;
    }
};

// The loops over the lines, bands and samples of a tile. What they move is one sample.
struct Loops {
    Loop line;
    Loop band;
    Loop sample;
};

Loops LoopsOf(const RasterLayout& raster, const TileWindow& tile, std::size_t tileBands,
              std::size_t size) {
    const std::size_t width = raster.samples * size, tileWidth = tile.width * size;
    switch (raster.interleave) {
        case Interleave::BIP:
            return {{tile.height, width * raster.bands, tileWidth * tileBands},
                    {tileBands, size, size},
                    {tile.width, size * raster.bands, size * tileBands}};
        case Interleave::BIL:
            return {{tile.height, width * raster.bands, tileWidth * tileBands},
                    {tileBands, width, tileWidth},
                    {tile.width, size, size}};
        case Interleave::BSQ:
            return {{tile.height, width, tileWidth},
                    {tileBands, width * raster.lines, tileWidth * tile.height},
                    {tile.width, size, size}};
        default:
            return {{tile.height, width, tileWidth}, {1, 0, 0}, {tile.width, size, size}};
    }
}

// How many bands from position `first` of the list on follow one another in the raster.
std::uint32_t NeighbouringBands(TileBands bands, std::uint32_t first) {
    std::uint32_t next = first + 1;
    while (next < bands.count && bands.numbers[next] == bands.numbers[next - 1] + 1) ++next;
    return next - first;
}

// Runs three loops, of which the innermost steps over neighbouring samples on both sides: it is one
// move, and so is every loop that goes on where the one within it ends.
template <class Way>
void CopyBox(Loop outer, Loop middle, Loop inner, typename Way::Raster raster,
             typename Way::Tile tile) {
    if (middle.count == 1 || middle.Continues(inner)) {
        inner.count *= middle.count;
        middle = outer;
        outer.count = 1;
        if (middle.count == 1 || middle.Continues(inner)) {
            inner.count *= middle.count;
            middle.count = 1;
        }
    }
    for (std::size_t i = 0; i < outer.count; ++i)
        for (std::size_t j = 0; j < middle.count; ++j)
            Way::Move(raster + i * outer.inRaster + j * middle.inRaster,
                      tile + i * outer.inTile + j * middle.inTile, inner.count * inner.inTile);
}

// Cuts a list into stretches of neighbouring bands, each of which is a box.
template <class Way>
void CopyStretches(std::int32_t interleave, TileBands bands, const Loops& loops,
                   typename Way::Raster raster, typename Way::Tile tile) {
    for (std::uint32_t k = 0; k < bands.count;) {
        const std::uint32_t together = NeighbouringBands(bands, k);
        const Loop band{together, loops.band.inRaster, loops.band.inTile};
        const auto from = raster + static_cast<std::size_t>(bands.numbers[k]) * band.inRaster;
        const auto to = tile + k * band.inTile;
        if (interleave == Interleave::BIP)
            CopyBox<Way>(loops.line, loops.sample, band, from, to);
        else if (interleave == Interleave::BIL)
            CopyBox<Way>(loops.line, band, loops.sample, from, to);
        else
            CopyBox<Way>(band, loops.line, loops.sample, from, to);
        k += together;
    }
}

// Moves a few bands of a line of pixels in one pass: bands that stand together in the tile, and
// anywhere in the raster's pixel.
template <class Way>
using Pass = void (*)(const Loop& pixel, const int* bands, typename Way::Raster raster,
                      typename Way::Tile tile);

// Raster and tile lie apart. The compiler is told so for narrow samples alone: it then gathers them
// into wider moves, which are quicker for those and slower for samples of 8 bytes.
template <class Pointer, std::size_t kSize>
using Apart = std::conditional_t<(kSize < 8), Pointer __restrict, Pointer>;

template <class Way, std::size_t kSize, std::uint32_t kBands>
void CopyPixels(const Loop& pixel, const int* bands, Apart<typename Way::Raster, kSize> raster,
                Apart<typename Way::Tile, kSize> tile) {
    const std::size_t inRaster = pixel.inRaster, inTile = pixel.inTile;
    typename Way::Raster samples[kBands];
    for (std::uint32_t k = 0; k < kBands; ++k)
        samples[k] = raster + static_cast<std::size_t>(bands[k]) * kSize;
    // Several pixels for each step of the pointers, which cost as much as the moves.
    constexpr std::size_t kPixels = 4;
    std::size_t left = pixel.count;
    for (; left >= kPixels; left -= kPixels) {
        for (std::size_t p = 0; p < kPixels; ++p)
            for (std::uint32_t k = 0; k < kBands; ++k)
                Way::Move(samples[k] + p * inRaster, tile + p * inTile + k * kSize, kSize);
        for (std::uint32_t k = 0; k < kBands; ++k) samples[k] += kPixels * inRaster;
        tile += kPixels * inTile;
    }
    for (; left != 0; --left) {
        for (std::uint32_t k = 0; k < kBands; ++k) {
            Way::Move(samples[k], tile + k * kSize, kSize);
            samples[k] += inRaster;
        }
        tile += inTile;
    }
}

// The passes for samples of a size, by the count of bands less one.
template <class Way, std::size_t kSize>
constexpr Pass<Way> kPasses[kPassBands] = {&CopyPixels<Way, kSize, 1>, &CopyPixels<Way, kSize, 2>,
                                           &CopyPixels<Way, kSize, 3>, &CopyPixels<Way, kSize, 4>};

template <class Way>
const Pass<Way>* PassesOf(std::size_t size) {
    static constexpr const Pass<Way>* kBySize[] = {
        kPasses<Way, 1>, kPasses<Way, 2>, kPasses<Way, 4>, kPasses<Way, 8>, kPasses<Way, 16>};
    return kBySize[std::countr_zero(size)];
}

// Pixel-interleaved samples of some of the bands, or of all in another order, line by line so that
// the passes over a line find it in the cache.
template <class Way>
void CopyPixelLines(TileBands bands, Loops loops, std::size_t size, typename Way::Raster raster,
                    typename Way::Tile tile) {
    const Pass<Way>* const passes = PassesOf<Way>(size);
    // Whole lines that one pass can move are one long line.
    if (bands.count <= kPassBands && loops.line.Continues(loops.sample)) {
        loops.sample.count *= loops.line.count;
        loops.line.count = 1;
    }
    for (std::size_t line = 0; line < loops.line.count; ++line) {
        // No pointer goes on behind the last line: the step of a raster of one line, which nothing
        // bounds, may lead anywhere.
        const auto from = raster + line * loops.line.inRaster;
        const auto to = tile + line * loops.line.inTile;
        for (std::uint32_t k = 0; k < bands.count;) {
            const std::uint32_t together = NeighbouringBands(bands, k);
            const bool isBlock = together * size >= kBlockBytes;
            const std::uint32_t count = isBlock ? together : std::min(bands.count - k, kPassBands);
            if (isBlock)
                CopyBox<Way>({1, 0, 0}, loops.sample, {together, size, size},
                             from + static_cast<std::size_t>(bands.numbers[k]) * size,
                             to + k * size);
            else
                passes[count - 1](loops.sample, bands.numbers + k, from, to + k * size);
            k += count;
        }
    }
}

// Looked at by an assertion alone.
[[maybe_unused]] bool LiesWithin(const RasterLayout& layout, const TileWindow& window,
                                 TileBands bands) {
    const std::int64_t right = std::int64_t{window.x} + window.width;
    const std::int64_t bottom = std::int64_t{window.y} + window.height;
    if (window.x < 0 || window.y < 0 || right > layout.samples || bottom > layout.lines)
        return false;
    return std::all_of(bands.numbers, bands.numbers + bands.count, [&layout](int band) {
        return band >= 0 && static_cast<std::uint32_t>(band) < layout.bands;
    });
}

template <class Way>
void CopyTile(RasterLayout layout, const TileWindow& window, TileBands bands,
              std::size_t sampleSize, typename Way::Raster raster, typename Way::Tile tile) {
    static constexpr int kOnlyBand = 0;
    if (layout.interleave == Interleave::None) {
        layout.bands = 1;
        bands = {&kOnlyBand, 1};
    }
    if (window.width == 0 || window.height == 0 || bands.count == 0) return;
    assert(raster && tile && "a tile needs its buffer");
    assert(LiesWithin(layout, window, bands) && "a tile lies within its raster");
    assert(std::has_single_bit(sampleSize) && sampleSize <= 16 &&
           "samples have 1, 2, 4, 8 or 16 bytes");
    const Loops loops = LoopsOf(layout, window, bands.count, sampleSize);
    raster += static_cast<std::size_t>(window.y) * loops.line.inRaster +
              static_cast<std::size_t>(window.x) * loops.sample.inRaster;
    const bool allBands = bands.count == layout.bands && bands.numbers[0] == 0 &&
                          NeighbouringBands(bands, 0) == bands.count;
    if (layout.interleave == Interleave::BIP && !allBands)
        CopyPixelLines<Way>(bands, loops, sampleSize, raster, tile);
    else
        CopyStretches<Way>(layout.interleave, bands, loops, raster, tile);
}

}  // namespace

void CopyTileFromRaster(const RasterLayout& layout, const TileWindow& window, TileBands bands,
                        std::size_t sampleSize, const void* raster, void* tile) {
    CopyTile<ToTile>(layout, window, bands, sampleSize, static_cast<const unsigned char*>(raster),
                     static_cast<unsigned char*>(tile));
}

void CopyTileToRaster(const RasterLayout& layout, const TileWindow& window, TileBands bands,
                      std::size_t sampleSize, void* raster, const void* tile) {
    CopyTile<ToRaster>(layout, window, bands, sampleSize, static_cast<unsigned char*>(raster),
                       static_cast<const unsigned char*>(tile));
}

}  // namespace zelm
