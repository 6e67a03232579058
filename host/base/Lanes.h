// InLanes: a range of lines divided among the threads of the current arena.
#ifndef ZMC_HOST_BASE_LANES_H
#define ZMC_HOST_BASE_LANES_H

#include <oneapi/tbb/parallel_for.h>

#include <cstdint>

namespace zmchost {

// Calls share(lane, first, last) once for each of `lanes` equal shares [first, last) of the range;
// shares of different lanes may run at the same time.
template <class Share>
void InLanes(std::uint32_t lanes, std::uint32_t begin, std::uint32_t end, const Share& share) {
    const std::uint64_t count = end - begin;
    const auto bound = [&](std::uint32_t lane) {
        return begin + static_cast<std::uint32_t>(count * lane / lanes);
    };
    oneapi::tbb::parallel_for(
        std::uint32_t{0}, lanes,
        [&](std::uint32_t lane) {
            if (bound(lane) < bound(lane + 1)) share(lane, bound(lane), bound(lane + 1));
        },
        oneapi::tbb::simple_partitioner());
}

}  // namespace zmchost

#endif
