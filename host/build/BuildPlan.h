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

#include <algorithm>
#include <bit>
#include <cstdint>
#include <vector>

#include "host/build/PartGrid.h"

namespace zmchost {

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

// Lines of a strip that begins at `first`, of a level or a part of it that ends at `end`: none has
// lines of two rows of tiles.
inline std::uint32_t StripLines(std::uint32_t first, std::uint32_t end) {
    return std::min(kTileSide - first % kTileSide, end - first);
}

// Pixels [begin, end) of a line of the base level that a column owns, or lines that a pass owns,
// and [readBegin, readEnd) that it needs.
struct Span {
    std::uint32_t begin = 0;
    std::uint32_t end = 0;
    std::uint32_t readBegin = 0;
    std::uint32_t readEnd = 0;
};
using Column = Span;

// One walk over a base level or a part of it, from which the levels up to topLevel are made.
struct Pass {
    std::uint32_t baseLevel = 0;
    std::uint32_t topLevel = 0;
    std::uint32_t stripsAhead = 2;  // strips of the base level that are under way at one time
    std::uint64_t memory = 0;       // bytes of all strips
    std::vector<Column> columns;
    Span lines;
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

// The passes that make what is above a level, in order; empty if the budget is below LeastMemory,
// and where nothing is above it but for level 0, which is made itself.
std::vector<Pass> PlanPasses(const PlanInput& input, std::uint32_t base = 0);

// Parts of about that many pixels of level 0, at least of one tile each; larger ones where there
// would be too many. They make as many levels as the budget and the size have room for without
// kernels that read much twice. The budget is not below LeastMemory.
PartGrid PlanParts(const PlanInput& input, std::uint32_t partWidth, std::uint32_t partHeight);

// The pass of one part.
Pass PlanPart(const PlanInput& input, const PartGrid& grid, std::uint64_t part);

// The passes that renew what depends on windows of level 0, each of which lies in the raster: whole
// tiles of level 0, which have the same base and top, and then of one level after the other the
// tiles with a cell whose value comes from them. The budget is not below LeastMemory.
std::vector<Pass> PlanUpdate(const PlanInput& input, const std::vector<zelm::Rectangle>& changed);

}  // namespace zmchost

#endif
