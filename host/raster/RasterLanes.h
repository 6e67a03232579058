// RasterLanes: several threads at work on one open pyramid, each with a raster of its own on it.
//
// A Raster is used by one thread at a time. A lane has one that reads the same open file, with the
// same no-data values, and takes one piece of the work after the other; lanes run side by side. The
// threads are gone when Run returns. The object itself is used by one thread at a time, and the
// first raster has to outlive it.
#ifndef ZMC_HOST_RASTER_RASTERLANES_H
#define ZMC_HOST_RASTER_RASTERLANES_H

#include <cstdint>
#include <functional>
#include <vector>

#include "host/raster/Raster.h"

namespace zmchost {

class RasterLanes {
public:
    // As many lanes as `threads`, or as the machine has processors for 0, but no more than hold
    // `bytes` each in `most` together; at least one, which is the raster itself. Throws as
    // Raster::Another.
    RasterLanes(Raster& raster, std::uint32_t threads, std::uint64_t bytes, std::uint64_t most);

    std::uint32_t Count() const { return static_cast<std::uint32_t>(others.size()) + 1; }
    // Lane 0 has the first raster.
    Raster& At(std::uint32_t lane) { return lane == 0 ? first : others[lane - 1]; }

    // Calls work(lane, piece) for every piece from 0 on. A lane takes them in rising order. What a
    // call throws ends the work of all and comes out, of several the first.
    void Run(std::uint64_t pieces,
             const std::function<void(std::uint32_t lane, std::uint64_t piece)>& work);
    // The same for the squares of `side` pixels, at least 1, that a level is made of: rows of them
    // from the top, each from the left, smaller at the right and at the bottom.
    void RunBlocks(std::uint32_t level, std::uint32_t side,
                   const std::function<void(std::uint32_t lane, const Window& block)>& work);

private:
    Raster& first;
    std::vector<Raster> others;
};

}  // namespace zmchost

#endif
