#include "render/Colormaps.h"

#include <algorithm>

namespace zmcrender {
namespace {

struct Entry {
    std::string_view name;
    std::string_view colours;
};

constexpr Entry kMaps[] = {
#include <Colormaps.inc>
};

constexpr unsigned Digit(char c) {
    return static_cast<unsigned>(c <= '9' ? c - '0' : c - 'a' + 10);
}

Colormap Decoded(std::string_view colours) {
    Colormap map;
    for (std::size_t i = 0; i < map.size(); ++i)
        for (std::size_t part = 0; part < 3; ++part) {
            const char* const digits = &colours[(3 * i + part) * 2];
            map[i][part] = static_cast<unsigned char>(16 * Digit(digits[0]) + Digit(digits[1]));
        }
    return map;
}

constexpr auto NamesOfMaps() {
    std::array<std::string_view, std::size(kMaps)> names;
    for (std::size_t i = 0; i < names.size(); ++i) names[i] = kMaps[i].name;
    return names;
}
constexpr auto kNames = NamesOfMaps();

}  // namespace

std::span<const std::string_view> ColormapNames() { return kNames; }

std::optional<Colormap> FindColormap(std::string_view name) {
    const bool reversed = name.starts_with('-');
    if (reversed) name.remove_prefix(1);
    const auto found = std::find_if(std::begin(kMaps), std::end(kMaps),
                                    [&](const Entry& entry) { return entry.name == name; });
    if (found == std::end(kMaps)) return std::nullopt;
    Colormap map = Decoded(found->colours);
    if (reversed) std::reverse(map.begin(), map.end());
    return map;
}

}  // namespace zmcrender
