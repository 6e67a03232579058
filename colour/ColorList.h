// ColorList: the colours of a stored palette as numbers, for those who have no use for an object of
// each, of which there may be 65,536.
//
// Colours count from 0 without a gap. Behind them stand the null colours that lookups have left: a
// palette of that content has an entry for each, and counts none of them.
#ifndef ZMC_COLOUR_COLORLIST_H
#define ZMC_COLOUR_COLORLIST_H

#include <cstdint>
#include <vector>

#include "colour/Palette.h"

namespace zelm {

class ColorList {
public:
    // From the low byte on: red, green, blue, alpha.
    using Rgba = std::uint32_t;
    static constexpr Rgba Pack(std::uint8_t red, std::uint8_t green, std::uint8_t blue,
                               std::uint8_t alpha) {
        return red | Rgba{green} << 8 | Rgba{blue} << 16 | Rgba{alpha} << 24;
    }
    static constexpr std::uint8_t Channel(Rgba color, int index) {
        return static_cast<std::uint8_t>(color >> (8 * index));
    }

    // Each may throw std::bad_alloc.
    void Add(Rgba color) { colors.push_back(color); }
    void LookUp(std::uint32_t index);

    void Clear();
    const std::vector<Rgba>& Colors() const { return colors; }

    // Fills an empty palette with what Palette's AddColor and GetColor would have made of the same.
    // Throws std::bad_alloc; the palette is then of no use.
    void CopyTo(Palette& target) const;

private:
    std::vector<Rgba> colors;
    std::vector<std::uint32_t> lookedUp;  // indexes that had no colour then
};

}  // namespace zelm

#endif
