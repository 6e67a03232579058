#include "render/Hillshade.h"

#include <algorithm>
#include <cmath>
#include <numbers>

namespace zmcrender {

Slope HornSlope(const double* above, const double* line, const double* below, std::size_t at) {
    const double centre = line[at];
    const auto height = [centre](double value) { return std::isnan(value) ? centre : value; };
    const double a = height(above[at - 1]), b = height(above[at]), c = height(above[at + 1]);
    const double d = height(line[at - 1]), f = height(line[at + 1]);
    const double g = height(below[at - 1]), h = height(below[at]), i = height(below[at + 1]);
    return {((c + 2 * f + i) - (a + 2 * d + g)) / 8, ((a + 2 * b + c) - (g + 2 * h + i)) / 8};
}

Lighting::Lighting(const Light& light) {
    constexpr double degree = std::numbers::pi / 180;
    const double level = std::cos(light.altitude * degree);
    right = level * std::sin(light.azimuth * degree);
    up = level * std::cos(light.azimuth * degree);
    upright = std::sin(light.altitude * degree);
}

double Lighting::operator()(const Slope& slope, double factor) const {
    const double p = slope.right * factor, q = slope.up * factor;
    const double t = (upright - p * right - q * up) / std::sqrt(1 + p * p + q * q);
    return std::clamp(t, 0.0, 1.0);
}

}  // namespace zmcrender
