// Checksum: 64 bits by which damage to a text is seen. It guards against accidents alone: anybody
// can make a text to a number. The numbers stand in files.
#ifndef ZMC_HOST_BASE_CHECKSUM_H
#define ZMC_HOST_BASE_CHECKSUM_H

#include <cstdint>
#include <string_view>

namespace zmchost {

// FNV-1a.
constexpr std::uint64_t Checksum(std::string_view text) {
    std::uint64_t sum = 0xCBF29CE484222325u;
    for (const char c : text) {
        sum ^= static_cast<unsigned char>(c);
        sum *= 0x100000001B3u;
    }
    return sum;
}

}  // namespace zmchost

#endif
