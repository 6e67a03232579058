#include "raster/TileCopy.h"

#include <algorithm>
#include <cassert>
#include <cstring>
#include <type_traits>

#include "core/PixelVocabulary.h"

namespace zelm {
namespace {

// Bytes from which neighbouring bands of one pixel are moved as a block, not sample by sample.
constexpr std::size_t kBlockBytes = 64;
// Bands that one pass over a line moves.
constexpr std::uint32_t kPassBands = 4;

// Distance in bytes between neighbouring lines, bands and samples.
struct Strides {
    std::size_t line;
    std::size_t band;
    std::size_t sample;
};

Strides StridesOf(std::int32_t interleave, std::size_t samples, std::size_t lines,
                  std::size_t bands, std::size_t size) {
    switch (interleave) {
        case Interleave::BIP:
            return {samples * bands * size, size, bands * size};
        case Interleave::BIL:
            return {samples * bands * size, samples * size, size};
        case Interleave::BSQ:
            return {samples * size, samples * lines * size, size};
        default:
            return {samples * size, 0, size};
    }
}

// One dimension of a rectangular copy.
struct Dimension {
    std::size_t count;
    std::size_t rasterStride;
    std::size_t tileStride;

    bool Continues(const Dimension& inner) const {
        return rasterStride == inner.count * inner.rasterStride &&
               tileStride == inner.count * inner.tileStride;
    }
};

// How many bands from position `first` of the list on follow one another in the raster.
std::uint32_t NeighbouringBands(TileBands bands, std::uint32_t first) {
    std::uint32_t next = first + 1;
    while (next < bands.count && bands.numbers[next] == bands.numbers[next - 1] + 1) ++next;
    return next - first;
}

template <bool kToTile>
struct Side;
template <>
struct Side<true> {
    using Raster = const unsigned char*;
    using Tile = unsigned char*;
};
template <>
struct Side<false> {
    using Raster = unsigned char*;
    using Tile = const unsigned char*;
};

// The copies of one direction and one sample size.
template <bool kToTile, std::size_t kSize>
class Copier {
public:
    using Raster = typename Side<kToTile>::Raster;
    using Tile = typename Side<kToTile>::Tile;

    static void Run(const RasterLayout& layout, const TileWindow& window, TileBands bands,
                    Raster raster, Tile tile) {
        const Strides in =
            StridesOf(layout.interleave, layout.samples, layout.lines, layout.bands, kSize);
        const Strides out =
            StridesOf(layout.interleave, window.width, window.height, bands.count, kSize);
        raster += static_cast<std::size_t>(window.y) * in.line +
                  static_cast<std::size_t>(window.x) * in.sample;
        const bool allBands = bands.count == layout.bands && bands.numbers[0] == 0 &&
                              NeighbouringBands(bands, 0) == bands.count;
        if (layout.interleave == Interleave::BIP && !allBands)
            CopyPixels(window, bands, in, out, raster, tile);
        else
            CopyRuns(layout.interleave, window, bands, in, out, raster, tile);
    }

private:
    // Lists that go through the raster's bands in order are cut into stretches of neighbouring
    // bands, each a box that is copied in the longest runs that lie together on both sides.
    static void CopyRuns(std::int32_t interleave, const TileWindow& window, TileBands bands,
                         const Strides& in, const Strides& out, Raster raster, Tile tile) {
        for (std::uint32_t k = 0; k < bands.count;) {
            const std::uint32_t together = NeighbouringBands(bands, k);
            const Dimension line{window.height, in.line, out.line};
            const Dimension band{together, in.band, out.band};
            const Dimension sample{window.width, in.sample, out.sample};
            Raster from = raster + static_cast<std::size_t>(bands.numbers[k]) * in.band;
            Tile to = tile + k * out.band;
            if (interleave == Interleave::BIP)
                CopyBox(line, sample, band, from, to);
            else if (interleave == Interleave::BIL)
                CopyBox(line, band, sample, from, to);
            else
                CopyBox(band, line, sample, from, to);
            k += together;
        }
    }

    // Copies a box whose innermost dimension lies together on both sides.
    static void CopyBox(Dimension outer, Dimension middle, Dimension inner, Raster raster,
                        Tile tile) {
        if (outer.count == 1) outer = {1, 0, 0};
        if (middle.Continues(inner) || middle.count == 1) {
            inner.count *= middle.count;
            middle = {1, 0, 0};
            if (outer.Continues(inner)) {
                inner.count *= outer.count;
                outer = {1, 0, 0};
            }
        }
        for (std::size_t i = 0; i < outer.count; ++i)
            for (std::size_t j = 0; j < middle.count; ++j)
                Move(raster + i * outer.rasterStride + j * middle.rasterStride,
                     tile + i * outer.tileStride + j * middle.tileStride, inner.count * kSize);
    }

    // Pixel-interleaved samples of some of the bands, or of all in another order, line by line so
    // that the passes over a line find it in the cache.
    static void CopyPixels(const TileWindow& window, TileBands bands, const Strides& in,
                           const Strides& out, Raster raster, Tile tile) {
        std::size_t width = window.width;
        std::size_t height = window.height;
        // Whole lines that one pass can move are one long line.
        if (bands.count <= kPassBands && in.line == width * in.sample) {
            width *= height;
            height = 1;
        }
        for (std::size_t line = 0; line < height; ++line) {
            for (std::uint32_t k = 0; k < bands.count;) {
                const std::uint32_t together = NeighbouringBands(bands, k);
                if (together * kSize >= kBlockBytes) {
                    CopyBlocks(width, together, in.sample, out.sample,
                               raster + static_cast<std::size_t>(bands.numbers[k]) * kSize,
                               tile + k * kSize);
                    k += together;
                } else {
                    k += CopyPass(width, bands, k, in.sample, out.sample, raster, tile + k * kSize);
                }
            }
            raster += in.line;
            tile += out.line;
        }
    }

    static void CopyBlocks(std::size_t width, std::size_t bands, std::size_t rasterStep,
                           std::size_t tileStep, Raster raster, Tile tile) {
        for (std::size_t s = 0; s < width; ++s)
            Move(raster + s * rasterStep, tile + s * tileStep, bands * kSize);
    }

    // Moves the next bands of the list along one line, and tells how many.
    static std::uint32_t CopyPass(std::size_t width, TileBands bands, std::uint32_t first,
                                  std::size_t rasterStep, std::size_t tileStep, Raster raster,
                                  Tile tile) {
        const int* const numbers = bands.numbers + first;
        const std::uint32_t count = std::min(bands.count - first, kPassBands);
        switch (count) {
            case 1:
                CopyStrided<1>(width, numbers, rasterStep, tileStep, raster, tile);
                break;
            case 2:
                CopyStrided<2>(width, numbers, rasterStep, tileStep, raster, tile);
                break;
            case 3:
                CopyStrided<3>(width, numbers, rasterStep, tileStep, raster, tile);
                break;
            default:
                CopyStrided<kPassBands>(width, numbers, rasterStep, tileStep, raster, tile);
                break;
        }
        return count;
    }

    // Rasters of few bands, of which a tile takes some, are frequent enough to have loops in which
    // the compiler knows both steps.
    template <std::uint32_t kBands>
    static void CopyStrided(std::size_t width, const int* numbers, std::size_t rasterStep,
                            std::size_t tileStep, Raster raster, Tile tile) {
        constexpr std::size_t kTileStep = kBands * kSize;
        if (tileStep == kTileStep && rasterStep == 3 * kSize)
            CopySamples<kBands>(width, numbers, Step<3 * kSize>(), Step<kTileStep>(), raster, tile);
        else if (tileStep == kTileStep && rasterStep == 4 * kSize)
            CopySamples<kBands>(width, numbers, Step<4 * kSize>(), Step<kTileStep>(), raster, tile);
        else if (tileStep == kTileStep && rasterStep == 2 * kSize)
            CopySamples<kBands>(width, numbers, Step<2 * kSize>(), Step<kTileStep>(), raster, tile);
        else
            CopySamples<kBands>(width, numbers, rasterStep, tileStep, raster, tile);
    }

    template <std::size_t kBytes>
    using Step = std::integral_constant<std::size_t, kBytes>;

    template <std::uint32_t kBands, class RasterStep, class TileStep>
    static void CopySamples(std::size_t width, const int* numbers, RasterStep rasterStep,
                            TileStep tileStep, Raster __restrict raster, Tile __restrict tile) {
        Raster from[kBands];
        for (std::uint32_t k = 0; k < kBands; ++k)
            from[k] = raster + static_cast<std::size_t>(numbers[k]) * kSize;
        // Bytes have no vector code of this kind, and gain from fewer steps of the pointers.
        constexpr std::size_t kPixels = kSize == 1 ? 4 : 1;
        std::size_t s = 0;
        for (; s + kPixels <= width; s += kPixels) {
            for (std::size_t p = 0; p < kPixels; ++p)
                for (std::uint32_t k = 0; k < kBands; ++k)
                    Move(from[k] + p * rasterStep, tile + p * tileStep + k * kSize, kSize);
            for (std::uint32_t k = 0; k < kBands; ++k) from[k] += kPixels * rasterStep;
            tile += kPixels * tileStep;
        }
        for (; s < width; ++s) {
            for (std::uint32_t k = 0; k < kBands; ++k) {
                Move(from[k], tile + k * kSize, kSize);
                from[k] += rasterStep;
            }
            tile += tileStep;
        }
    }

    static void Move(const unsigned char* raster, unsigned char* tile,
                     std::size_t bytes) requires(kToTile) {
        std::memcpy(tile, raster, bytes);
    }
    static void Move(unsigned char* raster, const unsigned char* tile,
                     std::size_t bytes) requires(!kToTile) {
        std::memcpy(raster, tile, bytes);
    }
};

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

// Chooses the copier once per tile.
template <bool kToTile>
void CopyTile(RasterLayout layout, const TileWindow& window, TileBands bands,
              std::size_t sampleSize, typename Side<kToTile>::Raster raster,
              typename Side<kToTile>::Tile tile) {
    static constexpr int kOnlyBand = 0;
    if (layout.interleave == Interleave::None) {
        layout.bands = 1;
        bands = {&kOnlyBand, 1};
    }
    if (window.width == 0 || window.height == 0 || bands.count == 0) return;
    assert(raster && tile && "a tile needs its buffer");
    assert(LiesWithin(layout, window, bands) && "a tile lies within its raster");
    switch (sampleSize) {
        case 1:
            return Copier<kToTile, 1>::Run(layout, window, bands, raster, tile);
        case 2:
            return Copier<kToTile, 2>::Run(layout, window, bands, raster, tile);
        case 4:
            return Copier<kToTile, 4>::Run(layout, window, bands, raster, tile);
        case 8:
            return Copier<kToTile, 8>::Run(layout, window, bands, raster, tile);
        case 16:
            return Copier<kToTile, 16>::Run(layout, window, bands, raster, tile);
        default:
            assert(false && "samples have 1, 2, 4, 8 or 16 bytes");
    }
}

}  // namespace

void CopyTileFromRaster(const RasterLayout& layout, const TileWindow& window, TileBands bands,
                        std::size_t sampleSize, const void* raster, void* tile) {
    CopyTile<true>(layout, window, bands, sampleSize, static_cast<const unsigned char*>(raster),
                   static_cast<unsigned char*>(tile));
}

void CopyTileToRaster(const RasterLayout& layout, const TileWindow& window, TileBands bands,
                      std::size_t sampleSize, void* raster, const void* tile) {
    CopyTile<false>(layout, window, bands, sampleSize, static_cast<unsigned char*>(raster),
                    static_cast<const unsigned char*>(tile));
}

}  // namespace zelm
