// Renderer: turns samples of one raster into pictures in one style (Style.h has the formula).
//
// Making one settles all that does not depend on the samples: bands, bounds, tables. It does not
// change then, and any number of threads may render with it.
//
//     zmchost::Raster raster = zmchost::Raster::Open(module, "scene.pyr", zmchost::Access::Read);
//     zmcrender::RasterPixels pixels(raster);
//     zmcrender::Style style;
//     style.Set("stretch", "p2,98");
//     const zmcrender::Renderer renderer(zmcrender::FactsOf(raster), style, pixels);
//     const auto picture = zmcrender::RenderWindow(renderer, pixels, window, 1024, 768);
//
// Whoever has samples of a tile renders them without a source:
//     zmcrender::Samples tile{data, width, height};    // of renderer.Bands(), interleaved
//     const auto file = Encode(renderer.Render(tile), PictureFormat::Jpeg);
#ifndef ZMC_RENDER_RENDERER_H
#define ZMC_RENDER_RENDERER_H

#include <array>
#include <cstdint>
#include <memory>
#include <span>
#include <vector>

#include "render/Picture.h"
#include "render/PixelSource.h"
#include "render/RasterFacts.h"
#include "render/Style.h"

namespace zmcrender {

// Samples of Renderer::Bands() in the raster's type, borrowed. With a halo the buffer has, on all
// four sides, so many pixels more than the picture; `width` and `height` are those of the picture.
struct Samples {
    const void* data = nullptr;  // aligned as its type
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    bool planar = false;      // each band's samples by themselves, one band behind the other
    std::uint32_t halo = 0;   // at least Renderer::Halo()
    std::uint32_t level = 0;  // that they are of, for slopes
    const unsigned char* shown =
        nullptr;  // a byte a pixel of the buffer, 0: hidden; null: all shown
};

class Renderer {
public:
    // Settles the style for a raster. Where the archived records do not tell the bounds, or the
    // suiting factor of heights, a coarse level is read from `source`. Throws StyleError for what
    // the raster does not have or what does not go together, and what the source throws.
    Renderer(const RasterFacts& facts, const Style& style, PixelSource& source);
    ~Renderer();
    Renderer(Renderer&&) noexcept;
    Renderer& operator=(Renderer&&) noexcept;

    // The bands whose samples are wanted, from 0, each once, in this order.
    std::span<const std::uint32_t> Bands() const;
    std::uint32_t PixelType() const;
    // Channels of a picture that is opaque: 1 or 3.
    std::uint32_t Colours() const;
    // Pixels that have to be known around those that are shown: 0, or 1 with hillshade.
    std::uint32_t Halo() const;
    // The bounds in use, one for each band that is shown but alpha, or one for an expression; none
    // where a palette gives the colours or heights are lit without a colour map.
    std::span<const Range> Bounds() const;
    // The colours from the lower to the upper bound, 256 of red, green, blue, where a picture of
    // one band has a legend; empty where it has none.
    std::span<const std::array<unsigned char, 3>> LegendColours() const;
    const Style& Settings() const;

    // Whether the picture of these samples has their bytes as they are, so that whoever has them
    // need not render: bytes in the order of the picture, which no stretch changes and nothing
    // hides.
    bool IsCopy(const Samples& samples) const;
    // The picture of these samples: 1 or 3 channels, and alpha where any pixel is not opaque.
    // Throws std::bad_alloc.
    Picture Render(const Samples& samples) const;

private:
    class Plan;
    std::unique_ptr<const Plan> plan;
};

// The picture of a window of level 0 in width x height pixels: the coarsest level that is still as
// fine is read, in strips of some 32 MiB, rendered and resized (Resize.h). The window has a part in
// level 0 and the size is not 0. Throws zmchost::Error where a line of the window alone would take
// 256 MiB, and what the source throws.
Picture RenderWindow(const Renderer& renderer, PixelSource& source, const zmchost::Window& window,
                     std::uint32_t width, std::uint32_t height);

// A window of the raster in the scale 1 / 2^level, one to one. A raster has so many pixels in each
// scale as reach its edges, of which the last may lie half outside: an extent halved and rounded
// up. Where the raster has that level, its pixels are taken as they are, and the nearest ones for
// those that its size, which is rounded down, lacks. Coarser scales are reduced from its coarsest
// level, finer ones enlarged from its finest. `level` is 32 at most. Throws as RenderWindow.
Picture RenderInScale(const Renderer& renderer, PixelSource& source, std::uint32_t level,
                      const zmchost::Window& window);
// The pixels of such a scale along an extent of level 0.
inline std::uint32_t ExtentInScale(std::uint32_t extent, std::uint32_t level) {
    const std::uint64_t step = std::uint64_t{1} << level;
    return static_cast<std::uint32_t>((extent + (step - 1)) / step);
}

// The level that RenderWindow reads for it.
std::uint32_t LevelFor(const PixelSource& source, const zmchost::Window& window,
                       std::uint32_t width, std::uint32_t height);

}  // namespace zmcrender

#endif
