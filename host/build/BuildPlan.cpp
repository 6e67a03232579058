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

Span AllLines(const PlanInput& input, std::uint32_t base) {
    const std::uint32_t height = input.height >> base;
    return {0, height, 0, height};
}

Pass WholeWidth(const PlanInput& input, std::uint32_t base, std::uint32_t stripsAhead) {
    const std::uint32_t width = input.width >> base;
    const std::uint32_t levels = input.maxLevel - base;
    Pass pass{base, input.maxLevel, stripsAhead, 0, {{0, width, 0, width}}, AllLines(input, base)};
    pass.memory = StripMemory(width, levels, input.halo, input.pixelBytes, stripsAhead);
    return pass;
}

// What [begin, end) of `extent` pixels needs.
Span WithMargin(std::uint64_t begin, std::uint64_t end, std::uint64_t margin,
                std::uint64_t extent) {
    return {static_cast<std::uint32_t>(begin), static_cast<std::uint32_t>(end),
            static_cast<std::uint32_t>(begin - std::min(begin, margin)),
            static_cast<std::uint32_t>(std::min(end + margin, extent))};
}

void CutColumns(Pass& pass, const PlanInput& input, std::uint64_t first, std::uint64_t last,
                std::uint64_t columnWidth) {
    const std::uint64_t width = input.width >> pass.baseLevel;
    const std::uint64_t margin = HaloPixels(input, pass.topLevel - pass.baseLevel);
    for (std::uint64_t begin = first; begin < last; begin += columnWidth)
        pass.columns.push_back(
            WithMargin(begin, std::min(begin + columnWidth, last), margin, width));
}

// The widest columns of whole tiles of each level that the budget has room for.
std::uint64_t ColumnWidth(const PlanInput& input, std::uint32_t levels) {
    const std::uint64_t unit = ColumnUnit(levels);
    std::uint64_t width = unit;
    while (width < input.width && ColumnMemory(input, levels, width + unit) <= input.budget)
        width += unit;
    return width;
}

// As many levels as the budget has room for, and then columns as wide as it has room for.
Pass InColumns(const PlanInput& input, std::uint32_t base) {
    const std::uint32_t wanted = input.maxLevel - base;
    std::uint32_t levels = std::min(wanted, 1u);
    while (levels < wanted &&
           ColumnMemory(input, levels + 1, ColumnUnit(levels + 1)) <= input.budget)
        ++levels;
    const std::uint64_t width = ColumnWidth(input, levels);
    Pass pass{base, base + levels,        2, ColumnMemory(input, levels, width),
              {},   AllLines(input, base)};
    CutColumns(pass, input, 0, input.width >> base, width);
    return pass;
}

Pass PlanPass(const PlanInput& input, std::uint32_t base) {
    for (const std::uint32_t stripsAhead : {3u, 2u}) {
        Pass pass = WholeWidth(input, base, stripsAhead);
        if (pass.memory <= input.budget) return pass;
    }
    return InColumns(input, base);
}

std::uint32_t TilesFor(std::uint64_t pixels, std::uint64_t unit) {
    return static_cast<std::uint32_t>((pixels + unit - 1) / unit);
}

// Whether a side of a part, of so many pixels of all, is made of such tiles without a margin of
// more than a fiftieth and without becoming longer by more than a quarter.
bool SuitsSide(std::uint64_t side, std::uint64_t all, std::uint64_t unit, std::uint64_t margins) {
    if (unit > side || margins * 50 > side) return false;
    return side == all || TilesFor(side, unit) * unit * 4 <= side * 5;
}

// Whether parts of that size could make one more level: there is one, a column of its tiles fits
// the budget, and they suit the part.
bool HasRoomForLevel(const PlanInput& input, std::uint32_t level, std::uint64_t partWidth,
                     std::uint64_t partHeight) {
    if (level > input.maxLevel) return false;
    const std::uint64_t unit = ColumnUnit(level);
    const std::uint64_t margins = 2 * HaloPixels(input, level);
    return ColumnMemory(input, level, std::min<std::uint64_t>(unit, input.width)) <= input.budget &&
           SuitsSide(partWidth, input.width, unit, margins) &&
           SuitsSide(partHeight, input.height, unit, margins);
}

}  // namespace

zelm::Rectangle PartGrid::Area(std::uint64_t part) const {
    const std::uint64_t x = part % Across() * PartWidth();
    const std::uint64_t y = part / Across() * PartHeight();
    return {static_cast<std::uint32_t>(x), static_cast<std::uint32_t>(y),
            static_cast<std::uint32_t>(std::min(PartWidth(), width - x)),
            static_cast<std::uint32_t>(std::min(PartHeight(), height - y))};
}

PartGrid PlanParts(const PlanInput& input, std::uint32_t partWidth, std::uint32_t partHeight) {
    const auto bounded = [](std::uint32_t wanted, std::uint32_t all) {
        return std::uint64_t{std::clamp(wanted, std::min(kTileSide, all), all)};
    };
    std::uint64_t width = bounded(partWidth, input.width);
    std::uint64_t height = bounded(partHeight, input.height);
    PartGrid grid{input.width, input.height, 0, 1, 1};
    do {
        while (HasRoomForLevel(input, grid.level + 1, width, height)) ++grid.level;
        grid.columns = TilesFor(width, ColumnUnit(grid.level));
        grid.rows = TilesFor(height, ColumnUnit(grid.level));
        width = std::min<std::uint64_t>(2 * width, input.width);
        height = std::min<std::uint64_t>(2 * height, input.height);
    } while (grid.Count() > kMostParts);
    return grid;
}

Pass PlanPart(const PlanInput& input, const PartGrid& grid, std::uint64_t part) {
    const zelm::Rectangle area = grid.Area(part);
    const std::uint64_t width = ColumnWidth(input, grid.level);
    Pass pass{0, grid.level, 2, 0, {}, {}};
    CutColumns(pass, input, area.x, area.Right(), width);
    std::uint64_t widest = 0;
    for (const Column& column : pass.columns)
        widest = std::max<std::uint64_t>(widest, column.readEnd - column.readBegin);
    const auto memory = [&](std::uint32_t stripsAhead) {
        return StripMemory(widest, grid.level, input.halo, input.pixelBytes, stripsAhead);
    };
    if (memory(3) <= input.budget) pass.stripsAhead = 3;
    pass.memory = memory(pass.stripsAhead);
    pass.lines = WithMargin(area.y, area.Bottom(), HaloPixels(input, grid.level), input.height);
    return pass;
}

namespace {

// Tiles [first, last) of a row of tiles.
struct TileRun {
    std::uint32_t row = 0;
    std::uint32_t first = 0;
    std::uint32_t last = 0;
};

// The tiles that areas of a level touch, each once, from the top and the left.
std::vector<TileRun> RunsOf(const std::vector<zelm::Rectangle>& areas) {
    std::vector<TileRun> all;
    for (const zelm::Rectangle& area : areas)
        for (std::uint64_t row = area.y / kTileSide; row * kTileSide < area.Bottom(); ++row)
            all.push_back({static_cast<std::uint32_t>(row), area.x / kTileSide,
                           TilesFor(area.Right(), kTileSide)});
    std::sort(all.begin(), all.end(), [](const TileRun& a, const TileRun& b) {
        return a.row != b.row ? a.row < b.row : a.first < b.first;
    });
    std::vector<TileRun> runs;
    for (const TileRun& run : all)
        if (!runs.empty() && runs.back().row == run.row && run.first <= runs.back().last)
            runs.back().last = std::max(runs.back().last, run.last);
        else
            runs.push_back(run);
    return runs;
}

zelm::Rectangle WholeTiles(const zelm::Rectangle& area, const zelm::Rectangle& level) {
    const std::uint32_t x = area.x / kTileSide * kTileSide, y = area.y / kTileSide * kTileSide;
    const std::uint64_t right = std::uint64_t{TilesFor(area.Right(), kTileSide)} * kTileSide;
    const std::uint64_t bottom = std::uint64_t{TilesFor(area.Bottom(), kTileSide)} * kTileSide;
    return {x, y, static_cast<std::uint32_t>(std::min<std::uint64_t>(right, level.width) - x),
            static_cast<std::uint32_t>(std::min<std::uint64_t>(bottom, level.height) - y)};
}

// Cells [first, last) of a coarser level, of so many, that come from pixels [begin, end) of a row
// or column: a cell from its two pixels and those of the halo around them.
Span DependentCells(std::uint32_t begin, std::uint64_t end, std::uint32_t halo,
                    std::uint32_t cells) {
    const std::uint32_t first = begin > halo ? (begin - halo) / 2 : 0;
    const auto last =
        static_cast<std::uint32_t>(std::min<std::uint64_t>((end - 1 + halo) / 2 + 1, cells));
    return {first, std::max(first, last), 0, 0};
}

std::vector<zelm::Rectangle> Dependents(const std::vector<zelm::Rectangle>& areas,
                                        const PlanInput& input, std::uint32_t coarser) {
    std::vector<zelm::Rectangle> cells;
    for (const zelm::Rectangle& area : areas) {
        const Span x = DependentCells(area.x, area.Right(), input.halo, input.width >> coarser);
        const Span y = DependentCells(area.y, area.Bottom(), input.halo, input.height >> coarser);
        const zelm::Rectangle made{x.begin, y.begin, x.end - x.begin, y.end - y.begin};
        if (!made.IsEmpty()) cells.push_back(made);
    }
    return cells;
}

// The pass that makes tiles of `top`, which is the base or one above it.
Pass PlanRun(const PlanInput& input, std::uint32_t base, std::uint32_t top, const TileRun& run) {
    const std::uint64_t unit = ColumnUnit(top - base);
    const std::uint64_t width = input.width >> base, height = input.height >> base;
    Pass pass{base, top, 2, 0, {}, {}};
    CutColumns(pass, input, run.first * unit, std::min(run.last * unit, width),
               ColumnWidth(input, top - base));
    pass.lines = WithMargin(run.row * unit, std::min((run.row + std::uint64_t{1}) * unit, height),
                            HaloPixels(input, top - base), height);
    return pass;
}

}  // namespace

std::vector<Pass> PlanUpdate(const PlanInput& input, const std::vector<zelm::Rectangle>& changed) {
    const zelm::Rectangle all{0, 0, input.width, input.height};
    std::vector<zelm::Rectangle> areas;
    for (const zelm::Rectangle& window : changed) areas.push_back(WholeTiles(window, all));
    std::vector<Pass> passes;
    for (const TileRun& run : RunsOf(areas)) passes.push_back(PlanRun(input, 0, 0, run));
    for (std::uint32_t base = 0; base < input.maxLevel; ++base) {
        areas = Dependents(areas, input, base + 1);
        for (const TileRun& run : RunsOf(areas))
            passes.push_back(PlanRun(input, base, base + 1, run));
    }
    return passes;
}

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

std::vector<Pass> PlanPasses(const PlanInput& input, std::uint32_t base) {
    std::vector<Pass> passes;
    if (input.budget < LeastMemory(input)) return passes;
    for (bool more = base == 0 || base < input.maxLevel; more; more = base < input.maxLevel) {
        passes.push_back(PlanPass(input, base));
        base = passes.back().topLevel;
    }
    return passes;
}

}  // namespace zmchost
