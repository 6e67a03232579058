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

void RasterLanes::RunBlocks(
    std::uint32_t level, std::uint32_t side,
    const std::function<void(std::uint32_t lane, const Window& block)>& work) {
    const std::uint64_t width = first.Width(level), height = first.Height(level);
    const std::uint64_t across = (width + side - 1) / side, down = (height + side - 1) / side;
    Run(across * down, [&](std::uint32_t lane, std::uint64_t index) {
        const std::uint64_t x = index % across * side, y = index / across * side;
        const auto extent = [side](std::uint64_t rest) {
            return static_cast<std::uint32_t>(std::min<std::uint64_t>(side, rest));
        };
        work(lane, {static_cast<std::uint32_t>(x), static_cast<std::uint32_t>(y), extent(width - x),
                    extent(height - y)});
    });
}

}  // namespace zmchost
