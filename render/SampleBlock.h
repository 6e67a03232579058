// SampleBlock: a window of a level with what lies around it, as samples that a renderer takes.
#ifndef ZMC_RENDER_SAMPLEBLOCK_H
#define ZMC_RENDER_SAMPLEBLOCK_H

#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

#include "render/Channel.h"
#include "render/PixelSource.h"
#include "render/Renderer.h"

namespace zmcrender {

struct SampleBlock {
    std::vector<unsigned char> pixels;  // pixel-interleaved
    std::vector<unsigned char> mask;    // empty: nothing is hidden

    // Reads a window, which lies in the level, with `halo` pixels more on each side; beyond the
    // edges of the level its nearest pixels are repeated. The result lends what this block holds.
    Samples Read(PixelSource& source, std::uint32_t level, const zmchost::Window& window,
                 std::span<const std::uint32_t> bands, std::uint32_t halo);
};

// Line y of samples whose pixels, or whose bands where they are planar, are of that many bytes a
// sample.
PixelLine LineOf(const Samples& samples, std::size_t bands, std::size_t sampleBytes,
                 std::uint32_t y);
// The bytes of the mask for that line; null if nothing is hidden.
const unsigned char* ShownOf(const Samples& samples, std::uint32_t y);

// The level and the windows by which a raster is looked at where its records do not tell enough:
// all of the finest level of up to a million pixels; else 64 windows spread over the coarsest.
struct SampledWindows {
    std::uint32_t level = 0;
    std::vector<zmchost::Window> windows;
};
SampledWindows WindowsToSample(const PixelSource& source);

}  // namespace zmcrender

#endif
