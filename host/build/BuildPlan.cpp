#include "host/build/BuildPlan.h"

#include <algorithm>
#include <bit>

namespace zmchost {
namespace {

std::uint64_t HaloPixels(const PlanInput& input, std::uint32_t levels) {
    return std::uint64_t{input.halo} << levels;
}

// The narrowest column that holds whole tiles of each level up to `levels` above its base.
std::uint64_t ColumnUnit(std::uint32_t levels) { return std::uint64_t{kTileSide} << levels; }

std::uint64_t ColumnMemory(const PlanInput& input, std::uint32_t levels, std::uint64_t ownWidth) {
    return StripMemory(ownWidth + 2 * HaloPixels(input, levels), levels, input.halo,
                       input.pixelBytes, 2);
}

Pass WholeWidth(const PlanInput& input, std::uint32_t base, std::uint32_t stripsAhead) {
    const std::uint32_t width = input.width >> base;
    const std::uint32_t levels = input.maxLevel - base;
    Pass pass{base, input.maxLevel, stripsAhead, 0, {{0, width, 0, width}}};
    pass.memory = StripMemory(width, levels, input.halo, input.pixelBytes, stripsAhead);
    return pass;
}

void CutColumns(Pass& pass, const PlanInput& input, std::uint64_t columnWidth) {
    const std::uint64_t width = input.width >> pass.baseLevel;
    const std::uint64_t margin = HaloPixels(input, pass.topLevel - pass.baseLevel);
    for (std::uint64_t begin = 0; begin < width; begin += columnWidth) {
        const std::uint64_t end = std::min(begin + columnWidth, width);
        const std::uint64_t readBegin = begin - std::min(begin, margin);
        const std::uint64_t readEnd = std::min(end + margin, width);
        pass.columns.push_back({static_cast<std::uint32_t>(begin), static_cast<std::uint32_t>(end),
                                static_cast<std::uint32_t>(readBegin),
                                static_cast<std::uint32_t>(readEnd)});
    }
}

// As many levels as the budget has room for, and then columns as wide as it has room for.
Pass InColumns(const PlanInput& input, std::uint32_t base) {
    const std::uint32_t wanted = input.maxLevel - base;
    std::uint32_t levels = std::min(wanted, 1u);
    while (levels < wanted &&
           ColumnMemory(input, levels + 1, ColumnUnit(levels + 1)) <= input.budget)
        ++levels;
    const std::uint64_t unit = ColumnUnit(levels);
    std::uint64_t width = unit;
    while (ColumnMemory(input, levels, width + unit) <= input.budget) width += unit;
    Pass pass{base, base + levels, 2, ColumnMemory(input, levels, width), {}};
    CutColumns(pass, input, width);
    return pass;
}

Pass PlanPass(const PlanInput& input, std::uint32_t base) {
    for (const std::uint32_t stripsAhead : {3u, 2u}) {
        Pass pass = WholeWidth(input, base, stripsAhead);
        if (pass.memory <= input.budget) return pass;
    }
    return InColumns(input, base);
}

}  // namespace

std::uint32_t MaxLevelOf(std::uint32_t width, std::uint32_t height) {
    const std::uint32_t least = std::min(width, height);
    return least == 0 ? 0 : static_cast<std::uint32_t>(std::bit_width(least)) - 1;
}

std::uint32_t DefaultMaxLevel(std::uint32_t width, std::uint32_t height, std::uint32_t bands) {
    std::uint32_t most = MaxLevelOf(width, height);
    if (bands > zelm::kMaxInterleavedBands) most = std::min(most, kMaxMortonLevel);
    std::uint32_t level = 0;
    while (level < most && zelm::LevelGeometry::Extent(std::max(width, height), level) > kTileSide)
        ++level;
    return level;
}

std::uint64_t StripMemory(std::uint64_t width, std::uint32_t levels, std::uint32_t halo,
                          std::uint64_t pixelBytes, std::uint32_t stripsAhead) {
    const std::uint64_t keptRows = halo == 0 ? 0 : 2 * halo + 2;
    std::uint64_t rows = std::uint64_t{stripsAhead} * kTileSide + (levels == 0 ? 0 : keptRows);
    std::uint64_t bytes = rows * width * pixelBytes;
    // A coarser level has the strip that is being made and the one that is being written.
    for (std::uint32_t level = 1; level <= levels; ++level) {
        rows = std::uint64_t{2} * kTileSide + (level == levels ? 0 : keptRows);
        bytes += rows * (width >> level) * pixelBytes;
    }
    return bytes;
}

std::uint64_t LeastMemory(const PlanInput& input) {
    const std::uint32_t levels = std::min(input.maxLevel, 1u);
    const std::uint64_t narrow = ColumnMemory(input, levels, ColumnUnit(levels));
    return std::min(narrow, WholeWidth(input, 0, 2).memory);
}

std::vector<Pass> PlanPasses(const PlanInput& input) {
    std::vector<Pass> passes;
    if (input.budget < LeastMemory(input)) return passes;
    std::uint32_t base = 0;
    do {
        passes.push_back(PlanPass(input, base));
        base = passes.back().topLevel;
    } while (base < input.maxLevel);
    return passes;
}

}  // namespace zmchost
