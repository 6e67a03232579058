// SourceNumber: the identity of sources whose files have no number of the system's.
#ifndef ZMC_GDAL_SOURCENUMBER_H
#define ZMC_GDAL_SOURCENUMBER_H

#include <atomic>
#include <cstdint>

namespace zmcgdal {

// No volume of a disk has it.
inline constexpr std::uint64_t kNoVolume = ~std::uint64_t{0};

// Another one at each call, apart from those of sources in memory. Any thread.
inline std::uint64_t NextSourceNumber() {
    static std::atomic<std::uint64_t> last{std::uint64_t{1} << 63};
    return ++last;
}

}  // namespace zmcgdal

#endif
