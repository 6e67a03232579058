// GatherSamples: lets accumulators take the samples of level 0, each those of its band, on several
// threads.
#ifndef ZMC_HOST_BUILD_SAMPLEGATHERING_H
#define ZMC_HOST_BUILD_SAMPLEGATHERING_H

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <mutex>
#include <span>
#include <vector>

#include "host/raster/NoData.h"
#include "host/raster/RasterLanes.h"

namespace zmchost {

// Gatherer: has AddRow and Merge as BandAccumulator, is empty at first, and copied for each thread.
// `bytes` is what the gatherers of all bands take together; threads are as many as `threads`, 0 for
// all processors, but for what their copies would take. Samples with the no-data value of their
// band are marked as such for AddRow. `advance` is called now and then with the pixels that are
// done, on any thread, one call at a time; what it throws ends the walk. Throws as Raster::Read.
template <class T, class Gatherer>
void GatherSamples(Raster& raster, std::uint32_t threads, std::uint64_t bytes,
                   std::span<const std::uint32_t> bands, std::vector<Gatherer>& gatherers,
                   const std::function<void(std::uint64_t pixels)>& advance) {
    // Of samples and masks, and of gatherers, of all threads together.
    constexpr std::uint64_t kMostPixelBytes = std::uint64_t{32} << 20;
    constexpr std::uint64_t kMostGatherers = std::uint64_t{96} << 20;
    // Small tiles are taken together, up to about so many pixels a side.
    constexpr std::uint32_t kSide = 256;

    const std::uint32_t level = raster.MinLevel();
    const auto count = static_cast<std::uint32_t>(bands.size());
    const bool marks = std::any_of(bands.begin(), bands.end(), [&](std::uint32_t band) {
        return RuleOfBand<T>(raster.Props(), band).hasValue;
    });
    RasterLanes lanes(raster, threads, bytes, kMostGatherers);
    const std::uint64_t most = std::max<std::uint64_t>(
        kMostPixelBytes / lanes.Count() / (std::uint64_t{count} * (sizeof(T) + 1)), 1);

    const std::uint32_t tile = std::max(raster.TileSide(), 1u);
    const std::uint32_t side = tile < kSide ? tile * (kSide / tile) : tile;
    struct Lane {
        std::vector<T> samples;
        std::vector<unsigned char> mask;
        std::vector<Gatherer> own;  // the first lane has those that were given
    };
    std::vector<Lane> state(lanes.Count());
    for (std::size_t lane = 1; lane < state.size(); ++lane) state[lane].own = gatherers;
    std::mutex advancing;

    const auto take = [&](std::uint32_t lane, const Window& piece) {
        auto& [samples, mask, own] = state[lane];
        std::vector<Gatherer>& takers = lane == 0 ? gatherers : own;
        const std::size_t stride = std::size_t{piece.width} * count;
        samples.resize(stride * piece.height);
        if (marks) mask.assign(samples.size(), 0);
        const unsigned char* const marked = marks ? mask.data() : nullptr;
        lanes.At(lane).Read(level, piece, bands, samples.data(), marks ? mask.data() : nullptr);
        for (std::uint32_t i = 0; i < count; ++i)
            for (std::uint32_t row = 0; row < piece.height; ++row)
                takers[i].AddRow(samples.data() + row * stride,
                                 marked ? marked + row * stride : nullptr, i, count, piece.width);
        const std::lock_guard lock(advancing);
        advance(piece.Pixels());
    };
    lanes.RunBlocks(level, side, [&](std::uint32_t lane, const Window& block) {
        // In runs of rows, or of parts of a row, of no more bytes than are held.
        const auto width = static_cast<std::uint32_t>(std::min<std::uint64_t>(block.width, most));
        const auto height =
            static_cast<std::uint32_t>(std::clamp<std::uint64_t>(most / width, 1, block.height));
        for (std::uint32_t y = 0; y < block.height; y += height)
            for (std::uint32_t x = 0; x < block.width; x += width)
                take(lane, {block.x + x, block.y + y, std::min(width, block.width - x),
                            std::min(height, block.height - y)});
    });
    for (std::size_t lane = 1; lane < state.size(); ++lane)
        for (std::uint32_t i = 0; i < count; ++i) gatherers[i].Merge(state[lane].own[i]);
}

}  // namespace zmchost

#endif
