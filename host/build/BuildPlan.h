// BuildPlan: the arithmetic of building a pyramid: levels, strips, columns, and the memory that
// they take. Pure functions; no file is touched.
//
// A strip is one row of tiles of one level. While the strips of a base level pass from top to
// bottom, those of the coarser levels are made from them, each half as wide, so all levels together
// take about twice the memory of the base. Where that does not fit the budget, the base is cut into
// columns of whole tiles of each of the first levels; a pass walks column after column and makes as
// many levels as the columns allow, and the next pass takes the last of these levels as its base.
// Kernels that reach over the edge of a column read `margin` pixels of its neighbours again.
#ifndef ZMC_HOST_BUILD_BUILDPLAN_H
#define ZMC_HOST_BUILD_BUILDPLAN_H

#include <bit>
#include <cstdint>
#include <vector>

#include "format/PyramidHeaderRecord.h"

namespace zmchost {

// Side of the tiles of every file that the module creates.
inline constexpr std::uint32_t kTileSide = zelm::kWrittenTileSize;
// Coarsest level whose tiles have addresses in the Morton ordering: behind it they shrink to
// nothing.
inline constexpr std::uint32_t kMaxMortonLevel = std::bit_width(kTileSide) - 1;

inline std::uint32_t TilesAlong(std::uint32_t pixels) {
    return pixels / kTileSide + (pixels % kTileSide != 0 ? 1 : 0);
}

// Coarsest level at which the raster still has a pixel.
std::uint32_t MaxLevelOf(std::uint32_t width, std::uint32_t height);

// The first level that fits one tile, or the coarsest that there can be.
std::uint32_t DefaultMaxLevel(std::uint32_t width, std::uint32_t height, std::uint32_t bands);

// Pixels [begin, end) of a line of the base level that a column owns, and [readBegin, readEnd) that
// it needs.
struct Column {
    std::uint32_t begin = 0;
    std::uint32_t end = 0;
    std::uint32_t readBegin = 0;
    std::uint32_t readEnd = 0;
};

// One walk over a base level, from which the levels up to topLevel are made.
struct Pass {
    std::uint32_t baseLevel = 0;
    std::uint32_t topLevel = 0;
    std::uint32_t stripsAhead = 2;  // strips of the base level that are under way at one time
    std::uint64_t memory = 0;       // bytes of all strips
    std::vector<Column> columns;
};

struct PlanInput {
    std::uint32_t width = 0;  // of level 0
    std::uint32_t height = 0;
    std::uint32_t maxLevel = 0;
    std::uint32_t halo = 0;        // rows and columns around a cell that its value depends on
    std::uint64_t pixelBytes = 0;  // of all bands, masks included
    std::uint64_t budget = 0;      // bytes for strips
};

// Bytes of all strips of a pass over `width` pixels of a base level and the `levels` levels made
// from it.
std::uint64_t StripMemory(std::uint64_t width, std::uint32_t levels, std::uint32_t halo,
                          std::uint64_t pixelBytes, std::uint32_t stripsAhead);

// The least budget that this raster can be built with.
std::uint64_t LeastMemory(const PlanInput& input);

// The passes, in order; empty if the budget is below LeastMemory.
std::vector<Pass> PlanPasses(const PlanInput& input);

}  // namespace zmchost

#endif
