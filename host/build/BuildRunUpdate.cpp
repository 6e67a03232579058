// What a run does for an update: tiles that depend on a change, and statistics from records.
#include <algorithm>
#include <utility>

#include "host/base/Threads.h"
#include "host/build/BuildRun.h"

namespace zmchost {
namespace {

constexpr const char* kRenewIt = "update it";
// Blocks of level 0 that records are kept of: so small that looking at one takes little, and so few
// that going through the records of all does.
constexpr std::uint64_t kBlockSide = 2048;
constexpr std::uint64_t kMostBlocks = 512;

std::uint64_t PixelsIn(const Pass& pass) {
    std::uint64_t pixels = 0;
    for (const Column& column : pass.columns)
        pixels += std::uint64_t{column.end - column.begin} * (pass.lines.end - pass.lines.begin);
    return pixels;
}

std::uint64_t TilesIn(const Pass& pass) {
    std::uint64_t tiles = 0;
    for (const Column& column : pass.columns)
        tiles += TilesAlong(column.end >> (pass.topLevel - pass.baseLevel)) -
                 (column.begin >> (pass.topLevel - pass.baseLevel)) / kTileSide;
    return tiles;
}

bool TouchesWindow(const Window& block, const std::vector<Window>& windows) {
    return std::any_of(windows.begin(), windows.end(), [&](const Window& window) {
        return !zelm::Intersection(block, window).IsEmpty();
    });
}

}  // namespace

void BuildRun::OpenUpdate(std::shared_ptr<zelm::files::ByteSource> pyramid) {
    inParts = true;
    // Statistics come from blocks, not from the strips that pass.
    gathered = true;
    raster.emplace(Raster::Open(module, std::move(pyramid), name));
    CheckLayout();
    Prepare();
    passes.clear();
}

std::uint64_t BuildRun::RenewTiles(const std::vector<Window>& changed) {
    const std::vector<Pass> planned = PlanUpdate(planInput, changed);
    progress = {};
    for (const Pass& pass : planned)
        if (pass.baseLevel == 0) progress.total += PixelsIn(pass);
    std::uint64_t made = 0;
    RunWithThreads(threads, [&] {
        for (const Pass& pass : planned) {
            // The source is asked for level 0 alone; its pixels stand in the file then.
            inPlace = pass.topLevel != 0;
            WalkPass(pass);
            made += TilesIn(pass);
        }
    });
    strips.reset();
    return made;
}

std::vector<Window> BuildRun::StatisticsBlocks() const {
    std::uint64_t side = kBlockSide;
    const auto along = [&](std::uint32_t pixels) { return (pixels + side - 1) / side; };
    while (along(props.samples) * along(props.lines) > kMostBlocks) side *= 2;
    std::vector<Window> blocks;
    for (std::uint64_t y = 0; y < props.lines; y += side)
        for (std::uint64_t x = 0; x < props.samples; x += side)
            blocks.push_back(
                {static_cast<std::uint32_t>(x), static_cast<std::uint32_t>(y),
                 static_cast<std::uint32_t>(std::min<std::uint64_t>(side, props.samples - x)),
                 static_cast<std::uint32_t>(std::min<std::uint64_t>(side, props.lines - y))});
    return blocks;
}

std::uint64_t BuildRun::GatherStatistics(const std::vector<Window>& changed, PyramidRecords* before,
                                         RecordsWriter* after) {
    if (work->StatisticsMemory() == 0) return 0;
    const std::vector<Window> blocks = StatisticsBlocks();
    const auto foreign = [&] {
        throw Error(name, kRenewIt, "its records are those of another build");
    };
    if (before && before->Pieces() != blocks.size() && before->Pieces() != 2 * blocks.size())
        foreign();
    std::vector<bool> looks;
    progress = {};
    for (const Window& block : blocks) {
        looks.push_back(!before || TouchesWindow(block, changed));
        if (looks.back()) progress.total += block.Pixels();
    }
    if (work->NeedsSecondWalk()) progress.total *= 2;
    const auto keep = [&](const std::string& piece) {
        if (after) after->Append(piece);
    };
    const std::unique_ptr<PixelWork> one = MakePixelWork(*raster, WorkSetup());
    const auto walk = [&](const Window& block, TakeRow take) {
        RunWithThreads(threads, [&] { WalkLevel0(block, *one, take); });
    };
    for (std::size_t i = 0; i < blocks.size(); ++i) {
        std::string sums;
        if (looks[i]) {
            one->ClearSums();
            walk(blocks[i], &PixelWork::TakeStatistics);
            sums = one->SaveSums();
        } else {
            sums = before->Piece(i);
        }
        if (!work->MergeSums(sums)) foreign();
        keep(sums);
    }
    const auto looked = static_cast<std::uint64_t>(std::count(looks.begin(), looks.end(), true));
    if (!work->NeedsSecondWalk()) return looked;
    work->BeginSecondWalk();
    one->ClearSums();
    if (!one->MergeSums(work->SaveSums())) foreign();
    one->BeginSecondWalk();
    for (std::size_t i = 0; i < blocks.size(); ++i) {
        // Counts are of use as long as minimum and maximum of the raster are those of before.
        std::string counts;
        if (!looks[i] && before->Pieces() > blocks.size() + i)
            counts = before->Piece(blocks.size() + i);
        if (counts.empty() || !work->MergeCounts(counts)) {
            one->ClearCounts();
            walk(blocks[i], &PixelWork::TakeCounts);
            counts = one->SaveCounts();
            if (!work->MergeCounts(counts)) foreign();
        }
        keep(counts);
    }
    return looked;
}

void BuildRun::StoreRenewed() {
    StoreRecords();
    if (!raster->IsComplete()) throw Error(name, kRenewIt, "tiles did not reach it");
    tiles.reset();
    work.reset();
    raster.reset();
}

}  // namespace zmchost
