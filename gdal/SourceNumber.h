// SourceNumber: by what the byte sources that are files of no file system of the machine's own are
// told apart (zelm::files::Identity). Any thread.
#ifndef ZMC_GDAL_SOURCENUMBER_H
#define ZMC_GDAL_SOURCENUMBER_H

#include <atomic>
#include <cstdint>

namespace zmcgdal {

// The volume of such a source.
inline constexpr std::uint64_t kNoVolume = ~std::uint64_t{0};

// A number that no other source of this process has: far from where other kinds begin to count.
inline std::uint64_t NextSourceNumber() {
    static std::atomic<std::uint64_t> last{std::uint64_t{1} << 63};
    return ++last;
}

}  // namespace zmcgdal

#endif
