// BuildRun: one run of a builder, step by step: a whole build, or what one process does of a build
// in parts (PartBuild.h), or an update (PyramidUpdate.h).
//
// Made for one source and one target. One thread; the work is done on as many as the options say.
#ifndef ZMC_HOST_BUILD_BUILDRUN_H
#define ZMC_HOST_BUILD_BUILDRUN_H

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "host/build/BandWeights.h"
#include "host/build/BuildFile.h"
#include "host/build/BuildPlan.h"
#include "host/build/HiddenSamples.h"
#include "host/build/PartBuild.h"
#include "host/build/PixelWork.h"
#include "host/build/PyramidBuilder.h"
#include "host/build/TileStore.h"
#include "host/file/PyramidRecords.h"
#include "host/raster/Raster.h"

namespace zmchost {

class BuildRun {
public:
    // Settles what is to be built; nothing is touched yet. Throws Error for options that do not fit
    // the source.
    BuildRun(ModulePtr loadedModule, RasterSource& rasterSource, std::string targetName,
             const BuildOptions& buildOptions);

    BuildReport Run();
    // The first step of it alone, into a file that is given, and all steps behind the pixels of
    // level 0, which that file has by then, but for its name.
    void LayOut(BuildFile& given);
    BuildReport Complete(BuildFile& laidOut);

    // What PartBuild does, in the order in which it may be asked for. The first opens the file that
    // was laid out.
    void OpenParts(const std::string& laidOut);
    std::uint64_t Facts() const;
    std::uint32_t MaxLevel() const { return maxLevel; }
    PartGrid PlanGrid(std::uint32_t partWidth, std::uint32_t partHeight);
    PartResult MakePart(const PartGrid& grid, std::uint64_t part);
    // The sums of one more part; false if they are of something else.
    bool TakeSums(const std::string& packed);
    std::uint64_t TilesOf(const PartGrid& grid, std::uint64_t part);
    // Once all sums have been taken.
    void BeginCounts();
    bool NeedsCounts() const { return work->NeedsSecondWalk(); }
    std::string CountPart(const PartGrid& grid, std::uint64_t part);
    bool TakeCounts(const std::string& packed) { return work->MergeCounts(packed); }
    BuildReport FinishParts(BuildFile& laidOut, const PartGrid& grid,
                            const std::vector<std::uint64_t>& uncounted);

    // What PyramidUpdate does, in this order (BuildRunUpdate.cpp). The first opens the pyramid,
    // from a source that takes what is written.
    void OpenUpdate(std::shared_ptr<zelm::files::ByteSource> pyramid);
    // Makes what depends on windows of the source anew; the number of tiles.
    std::uint64_t RenewTiles(const std::vector<Window>& changed);
    // Statistics of level 0: those of blocks without a window as `before` has them, if it is there.
    // What the blocks gave goes into `after`, unless that is null. The number of blocks looked at.
    std::uint64_t GatherStatistics(const std::vector<Window>& changed, PyramidRecords* before,
                                   RecordsWriter* after);
    // Stores what was gathered and the palettes into a file that has no document, and lets it go.
    void StoreRenewed();

private:
    // A strip on its way through the pipeline, and what it completes.
    struct Job {
        StripStore::Loan base;
        std::vector<StripStore::Loan> finished;
    };

    void SettleBands();
    void CountColors();
    void SettleNoData();
    void SettleLevels();
    void SettleOrdering();
    void SettleResampling();
    void SettleWeights(std::uint32_t sourceBands);
    void Plan();

    void LayOut();
    void Open(const std::string& path);
    void CheckLayout() const;
    void Reopen();
    void Prepare();
    void PrepareOnce();
    void Finish();
    void StoreAll();
    void MakeReport();
    void Fill();
    StripStore& StripsFor(const Pass& pass);
    void WalkPass(const Pass& pass);
    void WalkColumn(const Pass& pass, const Column& column, StripStore& store);
    void ReadStrip(const Pass& pass, const Column& column, Strip& strip);
    void LookAtStrip(const Pass& pass, const Column& column, Strip& strip);
    void WriteStrip(const Pass& pass, const Column& column, const Strip& strip);
    void CountLevel0(const Window& area);
    using TakeRow = void (PixelWork::*)(std::uint32_t lane, const std::byte* row,
                                        const unsigned char* mask, std::uint32_t width);
    void WalkLevel0(const Window& area, PixelWork& gatherer, TakeRow take);
    std::vector<Window> StatisticsBlocks() const;
    void StoreRecords();
    void Check();
    void Advance(std::uint64_t pixels);

    TileStoreSetup StoreSetup() const;
    PixelWorkSetup WorkSetup() const;
    std::uint64_t MetadataBound() const;
    Window Everything() const { return {0, 0, props.samples, props.lines}; }
    // The level from which coarser ones are made while the source's pixels pass over.
    std::uint32_t FirstBase() const { return passes.empty() ? 0 : passes.front().baseLevel; }

    ModulePtr module;
    RasterSource& source;
    std::string name;
    BuildOptions options;
    std::uint32_t threads = 1;
    std::uint32_t lanes = 1;

    zelm::RasterProps props;  // of the target
    std::vector<std::uint32_t> bands;
    std::vector<std::uint32_t> colors;  // of the palette of each band
    std::uint32_t maxLevel = 0;
    Resampling resampling = Resampling::Average;
    BandWeights weights;
    std::optional<HiddenSamples> hidden;
    std::uint32_t pixelBytes = 0;
    std::vector<Pass> passes;

    // Pixels are not the source's: level 0 of the file has them already.
    bool inPlace = false;
    // One process of several: what the statistics count by must not go by its threads.
    bool inParts = false;
    // The parts have gathered the statistics.
    bool gathered = false;
    PlanInput planInput;

    MemoryMeter meter;
    BuildFile* file = nullptr;
    std::optional<Raster> raster;
    std::unique_ptr<PixelWork> work;
    std::optional<TileStore> tiles;
    // Of the pass before, which serves the next part.
    std::unique_ptr<StripStore> strips;
    BuildProgress progress;
    std::chrono::steady_clock::time_point start = std::chrono::steady_clock::now();
    BuildReport report;
};

}  // namespace zmchost

#endif
