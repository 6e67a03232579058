// Tone: from t in [0, 1] to the level of a channel, through a gamma.
//
// A level is floor(M t^(1/gamma) + 0.5), M being 255 or 65535. Bytes come out of a table of the
// values of t at which the level changes, so that no power is computed for a sample. Does not
// change once it is made; any number of threads may use one.
#ifndef ZMC_RENDER_TONE_H
#define ZMC_RENDER_TONE_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <limits>

#include "render/Nearest.h"

namespace zmcrender {

class Tone {
public:
    explicit Tone(double exponent);  // gamma, above 0

    bool IsLinear() const { return gamma == 1; }
    // t in [0, 1], as a level of that width.
    void Level(double t, std::uint8_t& level) const {
        if (IsLinear())
            level = Straight<std::uint8_t>(t);
        else
            level = Bent(t);
    }
    void Level(double t, std::uint16_t& level) const;

    // A level where gamma is 1.
    template <class T>
    static T Straight(double t) {
        return Nearest<T>(std::numeric_limits<T>::max() * t);
    }

private:
    static constexpr std::size_t kCells = 4096;

    std::uint8_t Bent(double t) const {
        const auto at = static_cast<std::size_t>(t * kCells);
        std::size_t level = cell[at];
        // Cells in which many levels begin are few, unless gamma is extreme.
        if (cell[at + 1] - level > 4) return Searched(t, at);
        while (t >= start[level + 1]) ++level;
        return static_cast<std::uint8_t>(level);
    }
    std::uint8_t Searched(double t, std::size_t at) const;

    double gamma;
    std::array<double, 257> start{};               // least t of each level; of 256 above any
    std::array<std::uint16_t, kCells + 2> cell{};  // the level at i / kCells
};

}  // namespace zmcrender

#endif
