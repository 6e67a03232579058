#include "host/raster/RasterLanes.h"

#include <oneapi/tbb/parallel_for.h>

#include <algorithm>
#include <atomic>

#include "host/base/Threads.h"

namespace zmchost {

RasterLanes::RasterLanes(Raster& raster, std::uint32_t threads, std::uint64_t bytes,
                         std::uint64_t most)
    : first(raster) {
    const std::uint64_t wanted = std::min(threads != 0 ? threads : AvailableThreads(), kMaxThreads);
    const std::uint64_t count = std::clamp<std::uint64_t>(bytes == 0 ? wanted : most / bytes, 1,
                                                          std::max<std::uint64_t>(wanted, 1));
    for (std::uint64_t lane = 1; lane < count; ++lane) others.push_back(raster.Another());
}

void RasterLanes::Run(std::uint64_t pieces,
                      const std::function<void(std::uint32_t lane, std::uint64_t piece)>& work) {
    const auto lanes = static_cast<std::uint32_t>(std::min<std::uint64_t>(Count(), pieces));
    std::atomic<std::uint64_t> next = 0;
    std::atomic<bool> over = false;
    const auto run = [&](std::uint32_t lane) {
        for (std::uint64_t piece; !over && (piece = next++) < pieces;) try {
                work(lane, piece);
            } catch (...) {
                over = true;
                throw;
            }
    };
    if (lanes <= 1) return run(0);
    RunWithThreads(lanes, [&] {
        oneapi::tbb::parallel_for(std::uint32_t{0}, lanes, run, oneapi::tbb::simple_partitioner());
    });
}

}  // namespace zmchost
