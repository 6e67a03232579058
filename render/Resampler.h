// Resampler: another size of a picture whose lines come one after the other, from the top.
//
// Both directions work alike: each pixel of the target has some neighbours in the source, with
// weights that come to 1. Where it shrinks they are the parts that it covers; where it grows, the
// two nearest centres.
#ifndef ZMC_RENDER_RESAMPLER_H
#define ZMC_RENDER_RESAMPLER_H

#include <cstddef>
#include <cstdint>
#include <vector>

#include "render/Picture.h"
#include "render/Resize.h"

namespace zmcrender {

// The neighbours of one pixel along a direction.
struct Taps {
    std::uint32_t first = 0;
    std::vector<float> weights;  // of first, first + 1, and so on
    std::uint32_t Last() const { return first + static_cast<std::uint32_t>(weights.size()) - 1; }
};

// Those of all pixels of the target, for `extent` pixels of a source of `size` from `start` on.
std::vector<Taps> TapsOf(std::uint32_t size, double start, double extent, std::uint32_t target);

class Resampler {
public:
    // Of a source of that size and depth with 1 or 3 colours, alpha besides.
    Resampler(std::uint32_t sourceWidth, std::uint32_t sourceHeight, std::uint32_t colours,
              std::uint32_t depth, const Area& area, std::uint32_t width, std::uint32_t height);

    // Lines of the source, those behind the ones before, with alpha or without.
    void Add(const Picture& lines);
    // The picture, once all lines are there: with alpha where a pixel is not opaque, or always.
    Picture Finish(bool keepAlpha);

private:
    std::uint32_t colours, depth, sourceWidth;
    std::vector<Taps> across, down;
    Picture target;             // with alpha
    std::uint32_t taken = 0;    // lines of the source
    std::uint32_t made = 0;     // lines of the target
    bool opaque = true;         // all of them
    std::vector<float> wide;    // a line of the source: colours times alpha, and alpha in [0, 1]
    std::vector<float> line;    // the same in the target's width
    std::vector<float> before;  // the one before it
    std::vector<float> sum;     // of the line that is being made

    std::size_t Channels() const { return colours + 1; }
    void Widen(const Picture& lines, std::uint32_t y);
    void Narrow();
    void MakeLines();
    void Accumulate(const std::vector<float>& part, float weight);
    void Emit();
    template <class Level>
    void EmitAs(Level* levels);
};

}  // namespace zmcrender

#endif
