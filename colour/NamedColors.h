// The table of named colours: a vocabulary for hosts.
#ifndef ZMC_COLOUR_NAMEDCOLORS_H
#define ZMC_COLOUR_NAMEDCOLORS_H

#include <cstdint>

#include "core/String.h"

namespace zelm {

struct NamedColorRow {
    String name;          // lower case, without separators
    std::uint32_t rgba;   // from the low byte: red, green, blue, alpha
    std::uint8_t isNull;  // 1 in the last row alone
};

inline constexpr std::uint32_t kNamedColorCount = 146;

// The rows in their fixed order, the null colour last. Built on the first call, which may come
// from a load-time initialiser, and read-only after.
const NamedColorRow* NamedColors();

}  // namespace zelm

#endif
