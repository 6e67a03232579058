// Numbers of 8 bytes, the lowest first, as they stand at fixed places of files.
#ifndef ZMC_HOST_BASE_FIXEDNUMBERS_H
#define ZMC_HOST_BASE_FIXEDNUMBERS_H

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace zmchost {

inline std::string FixedNumber(std::uint64_t number) {
    std::string bytes;
    for (unsigned i = 0; i < 8; ++i) bytes += static_cast<char>(number >> (8 * i));
    return bytes;
}

// `bytes` reach 8 bytes behind `place` at least.
inline std::uint64_t FixedNumberAt(std::string_view bytes, std::size_t place) {
    std::uint64_t number = 0;
    for (unsigned i = 0; i < 8; ++i)
        number |= std::uint64_t{static_cast<unsigned char>(bytes[place + i])} << (8 * i);
    return number;
}

}  // namespace zmchost

#endif
