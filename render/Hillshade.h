// Hillshade: how much light falls on heights.
//
// Slopes are those of B. K. P. Horn, "Hill shading and the reflectance map", Proceedings of the
// IEEE 69 (1981), 14-47: weighed differences over the eight neighbours
//     a b c
//     d e f        p = ((c + 2f + i) - (a + 2d + g)) / 8   to the right
//     g h i        q = ((a + 2b + c) - (g + 2h + i)) / 8   to the top
// times z over the side of a pixel. The light that falls on it is the cosine between the surface's
// normal and the direction of the light, or nothing where it faces away:
//     t = max(0, (sin h - p cos h sin az - q cos h cos az) / sqrt(1 + p^2 + q^2))
// A neighbour whose height is missing counts as the pixel itself; at the edges of a raster the
// nearest pixels are repeated. Without a factor of the user's heights are multiplied so that the
// root mean square of their slopes, on the level where they are looked at, is kSuitingSlope.
#ifndef ZMC_RENDER_HILLSHADE_H
#define ZMC_RENDER_HILLSHADE_H

#include <cstddef>

#include "render/Style.h"

namespace zmcrender {

inline constexpr double kSuitingSlope = 0.5;

struct Slope {
    double right = 0;  // p
    double up = 0;     // q
};

// Of the pixel `at` of the middle one of three lines of heights; NaN of a missing one.
Slope HornSlope(const double* above, const double* line, const double* below, std::size_t at);

class Lighting {
public:
    explicit Lighting(const Light& light);
    // t in [0, 1] of a slope that is multiplied by `factor`.
    double operator()(const Slope& slope, double factor) const;

private:
    double right, up, upright;  // the direction to the light
};

}  // namespace zmcrender

#endif
