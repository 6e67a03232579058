// Checksum: 64 bits by which damage to a text is seen. It guards against accidents alone: anybody
// can make a text to a number. The numbers stand in files.
#ifndef ZMC_HOST_BASE_CHECKSUM_H
#define ZMC_HOST_BASE_CHECKSUM_H

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <span>
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

// The same for pixels, eight bytes at a time, as they lie in memory.
inline std::uint64_t PixelChecksum(std::uint64_t start, std::span<const std::byte> bytes) {
    constexpr std::uint64_t kPrime = 0x9E3779B97F4A7C15u;
    std::uint64_t sum = start + bytes.size();
    for (; !bytes.empty(); bytes = bytes.subspan(std::min<std::size_t>(8, bytes.size()))) {
        std::uint64_t word = 0;
        std::memcpy(&word, bytes.data(), std::min<std::size_t>(8, bytes.size()));
        sum = std::rotl((sum ^ word) * kPrime, 29);
    }
    return sum;
}

}  // namespace zmchost

#endif
