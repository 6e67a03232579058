#include "render/Tone.h"

#include <algorithm>
#include <cmath>

namespace zmcrender {

Tone::Tone(double exponent) : gamma(exponent) {
    if (IsLinear()) return;
    for (std::size_t level = 1; level < 256; ++level)
        start[level] = std::pow((static_cast<double>(level) - 0.5) / 255, gamma);
    start[256] = 2;
    for (std::size_t i = 0; i < cell.size(); ++i) {
        const double t = static_cast<double>(i) / kCells;
        const auto above = std::upper_bound(start.begin() + 1, start.end() - 1, t);
        cell[i] = static_cast<std::uint16_t>(above - start.begin() - 1);
    }
}

std::uint8_t Tone::Searched(double t, std::size_t at) const {
    const auto above =
        std::upper_bound(start.begin() + cell[at] + 1, start.begin() + cell[at + 1] + 1, t);
    return static_cast<std::uint8_t>(above - start.begin() - 1);
}

void Tone::Level(double t, std::uint16_t& level) const {
    const double bent = IsLinear() ? t : std::pow(t, 1 / gamma);
    level = Nearest<std::uint16_t>(65535 * bent);
}

}  // namespace zmcrender
