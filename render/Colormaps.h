// Colormaps: the colour maps of colormaps.txt, which the build puts into the program.
#ifndef ZMC_RENDER_COLORMAPS_H
#define ZMC_RENDER_COLORMAPS_H

#include <array>
#include <optional>
#include <span>
#include <string_view>

namespace zmcrender {

// Red, green, blue, by entry from the lowest value to the highest.
using Colormap = std::array<std::array<unsigned char, 3>, 256>;

// The names, in the order of the file.
std::span<const std::string_view> ColormapNames();
// The map of a name, reversed of "-NAME"; none for a name that there is not.
std::optional<Colormap> FindColormap(std::string_view name);

}  // namespace zmcrender

#endif
