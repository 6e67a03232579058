// Palettes made of plain numbers.
#ifndef ZMC_TESTS_HOST_PALETTES_H
#define ZMC_TESTS_HOST_PALETTES_H

#include <array>
#include <cstdint>
#include <vector>

#include "colour/Palette.h"

namespace zmctest {

inline zelm::PalettePtr PaletteOf(const std::vector<std::array<std::uint8_t, 4>>& colors) {
    zelm::PalettePtr palette(new zelm::Palette);
    zelm::RGBAColor entry{zelm::Array<unsigned char>()};
    for (const auto& color : colors) {
        entry.red = color[0];
        entry.green = color[1];
        entry.blue = color[2];
        entry.alpha = color[3];
        palette->AddColor(entry);
    }
    return palette;
}

}  // namespace zmctest

#endif
