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

namespace zmcrender {

class Tone {
public:
    explicit Tone(double exponent);  // gamma, above 0

    bool IsLinear() const { return gamma == 1; }
    // t in [0, 1], as a level of that width.
    void Level(double t, std::uint8_t& level) const;
    void Level(double t, std::uint16_t& level) const;

private:
    static constexpr std::size_t kCells = 1024;

    double gamma;
    std::array<double, 257> start{};               // least t of each level; of 256 above any
    std::array<std::uint16_t, kCells + 2> cell{};  // the level at i / kCells
};

}  // namespace zmcrender

#endif
