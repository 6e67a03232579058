#include "host/build/PartBuild.h"

#include <utility>

#include "host/base/Error.h"
#include "host/build/BuildRun.h"

namespace zmchost {

PartBuild::PartBuild(ModulePtr module, RasterSource& source, const std::string& target,
                     const BuildOptions& options, const std::string& laidOut)
    : run(std::make_unique<BuildRun>(std::move(module), source, target, options)), name(target) {
    run->OpenParts(laidOut);
    const zelm::RasterProps props = source.Props();
    width = props.samples;
    height = props.lines;
}

PartBuild::~PartBuild() = default;

PartGrid PartBuild::Plan(std::uint32_t partWidth, std::uint32_t partHeight) {
    return run->PlanGrid(partWidth, partHeight);
}

void PartBuild::SetGrid(const PartGrid& planned) {
    const auto fits = [&](std::uint32_t tiles, std::uint32_t pixels) {
        return tiles > 0 && tiles <= (pixels / kTileSide >> planned.level) + 1;
    };
    if (planned.width != width || planned.height != height || planned.level > run->MaxLevel() ||
        !fits(planned.columns, width) || !fits(planned.rows, height) ||
        planned.Count() > kMostParts)
        throw Error(name, "build it in parts", "they are those of another raster");
    grid = planned;
    counted.assign(static_cast<std::size_t>(grid.Count()), false);
}

std::uint64_t PartBuild::Facts() const { return run->Facts(); }

PartResult PartBuild::Make(std::uint64_t part) { return run->MakePart(grid, part); }

bool PartBuild::Take(std::uint64_t part, const PartResult& result) {
    return run->TilesOf(grid, part) == result.tiles && run->TakeSums(result.sums);
}

void PartBuild::BeginCounts() {
    if (!std::exchange(counting, true)) run->BeginCounts();
}

bool PartBuild::NeedsCounts() {
    BeginCounts();
    return run->NeedsCounts();
}

std::string PartBuild::Count(std::uint64_t part) {
    BeginCounts();
    return run->CountPart(grid, part);
}

bool PartBuild::TakeCounts(std::uint64_t part, const std::string& counts) {
    BeginCounts();
    counted[part] = run->TakeCounts(counts);
    return counted[part];
}

BuildReport PartBuild::Finish(BuildFile& file) {
    std::vector<std::uint64_t> uncounted;
    if (NeedsCounts())
        for (std::uint64_t part = 0; part < counted.size(); ++part)
            if (!counted[part]) uncounted.push_back(part);
    return run->FinishParts(file, grid, uncounted);
}

}  // namespace zmchost
