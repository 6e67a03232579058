#include "host/build/PyramidBuilder.h"

#include <oneapi/tbb/parallel_pipeline.h>

#include <algorithm>
#include <chrono>
#include <cstring>
#include <memory>
#include <optional>

#include "core/PixelVocabulary.h"
#include "format/DocumentLimits.h"
#include "host/base/Lanes.h"
#include "host/base/Threads.h"
#include "host/build/BuildFile.h"
#include "host/build/BuildPlan.h"
#include "host/build/HiddenSamples.h"
#include "host/build/LevelCascade.h"
#include "host/build/PixelWork.h"
#include "host/build/TileStore.h"
#include "host/file/PresentTiles.h"
#include "host/raster/Raster.h"

namespace zmchost {
namespace {

namespace tbb = oneapi::tbb;

// Bytes of tiles that the second walk over level 0 reads at a time: well below the least budget.
constexpr std::size_t kChunkBytes = std::size_t{4} << 20;

// One run of a builder, step by step. Made for one source and one target, used once.
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
    void Reopen();
    void Prepare();
    void Finish();
    void MakeReport();
    void Fill();
    void WalkPass(const Pass& pass);
    void WalkColumn(const Pass& pass, const Column& column, StripStore& store);
    void ReadStrip(const Pass& pass, const Column& column, Strip& strip);
    void LookAtStrip(const Pass& pass, const Column& column, Strip& strip);
    void WriteStrip(const Pass& pass, const Column& column, const Strip& strip);
    void CountLevel0();
    void StoreRecords();
    void Check();
    void Advance(std::uint64_t pixels);

    TileStoreSetup StoreSetup() const;
    PixelWorkSetup WorkSetup() const;
    std::uint64_t MetadataBound() const;

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

    MemoryMeter meter;
    BuildFile* file = nullptr;
    std::optional<Raster> raster;
    std::unique_ptr<PixelWork> work;
    std::optional<TileStore> tiles;
    BuildProgress progress;
    std::chrono::steady_clock::time_point start = std::chrono::steady_clock::now();
    BuildReport report;
};

BuildRun::BuildRun(ModulePtr loadedModule, RasterSource& rasterSource, std::string targetName,
                   const BuildOptions& buildOptions)
    : module(std::move(loadedModule)),
      source(rasterSource),
      name(std::move(targetName)),
      options(buildOptions) {
    threads = std::min(options.threads != 0 ? options.threads : AvailableThreads(), kMaxThreads);
    lanes = std::min(2 * threads, 16u);
    const zelm::RasterProps given = source.Props();
    props.samples = given.samples;
    props.lines = given.lines;
    props.bands = given.bands;
    props.pixelType = given.pixelType;
    props.noDataValues = given.noDataValues;
    if (given.samples == 0 || given.lines == 0 || given.bands == 0)
        throw Error(source.Name(), "build a pyramid of it", "it has no pixels");
    if (zelm::CheckedPixelType(given.pixelType) == 0)
        throw Error(source.Name(), "build a pyramid of it", "its pixel type has no reader");
    SettleBands();
    CountColors();
    SettleNoData();
    SettleOrdering();
    SettleLevels();
    SettleResampling();
    SettleWeights(given.bands);
    pixelBytes = props.bands * zelm::PixelSize(props.pixelType);
}

void BuildRun::SettleBands() {
    bands = options.bands;
    if (bands.empty())
        for (std::uint32_t band = 0; band < props.bands; ++band) bands.push_back(band);
    std::map<std::uint32_t, double> noData;
    for (std::uint32_t i = 0; i < bands.size(); ++i) {
        if (bands[i] >= props.bands)
            throw Error(source.Name(),
                        "take band " + std::to_string(bands[i]) + ", counted from 0,",
                        "it has " + std::to_string(props.bands));
        if (props.HasNoDataValue(bands[i])) noData[i] = props.GetNoDataValue(bands[i]);
    }
    props.bands = static_cast<std::uint32_t>(bands.size());
    props.noDataValues = noData;
    props.interleave = zelm::Interleave::BIP;
}

// Palettes are asked for again when they are stored: those of all bands together may take much more
// memory than the file that they come from.
void BuildRun::CountColors() {
    std::uint64_t all = 0;
    for (const std::uint32_t band : bands) {
        const zelm::PalettePtr palette = source.BandPalette(band);
        colors.push_back(palette ? palette->nextIndex : 0);
        all += colors.back();
        if (all > zelm::kMaxDocumentNodes)
            throw Error(source.Name(), "take its palettes",
                        "they have more colours than a pyramid file may, " +
                            std::to_string(zelm::kMaxDocumentNodes));
    }
}

void BuildRun::SettleNoData() {
    if (!options.noData) return;
    props.noDataValues.clear();
    if (!options.noData->value) return;
    for (std::uint32_t band = 0; band < props.bands; ++band)
        props.SetNoDataValue(band, *options.noData->value);
}

void BuildRun::SettleOrdering() {
    const bool morton = props.bands > zelm::kMaxInterleavedBands;
    if (options.ordering != Ordering::Auto && morton != (options.ordering == Ordering::Morton))
        throw Error(name, "use that tile ordering",
                    "a file of " + std::to_string(props.bands) + " bands is " +
                        (morton ? "always in Morton order" : "never in Morton order"));
    props.tileLines = options.ordering == Ordering::Scanline ? 1 : kTileSide;
    report.tileOrdering = zelm::TileOrderFor(props.bands, props.tileLines);
}

void BuildRun::SettleLevels() {
    std::uint32_t most = MaxLevelOf(props.samples, props.lines);
    if (props.bands > zelm::kMaxInterleavedBands) most = std::min(most, kMaxMortonLevel);
    maxLevel = options.levels.value_or(DefaultMaxLevel(props.samples, props.lines, props.bands));
    if (maxLevel > most)
        throw Error(name, "make " + std::to_string(maxLevel) + " levels",
                    "this raster can have " + std::to_string(most));
}

void BuildRun::SettleResampling() {
    const bool anyPalette =
        std::any_of(colors.begin(), colors.end(), [](auto n) { return n != 0; });
    resampling = options.resampling.value_or(anyPalette ? Resampling::Mode : Resampling::Average);
    // A palette of complex values makes no sense, but is no reason to fail by default.
    if (!options.resampling && !SupportsElementType(resampling, props.pixelType))
        resampling = Resampling::Nearest;
    if (!SupportsElementType(resampling, props.pixelType))
        throw Error(name, std::string("reduce by ") + ResamplingName(resampling),
                    std::string("pixels of type ") + zelm::PixelTypeName(props.pixelType) +
                        " have no order");
}

void BuildRun::SettleWeights(std::uint32_t sourceBands) {
    std::vector<zelm::PalettePtr> palettes;
    if (Computes(resampling))
        for (const std::uint32_t band : bands) palettes.push_back(source.BandPalette(band));
    weights = BandWeights::Of(options.weights ? &source : nullptr, source.Name(), sourceBands,
                              bands, resampling, std::move(palettes));
    if (weights.IsMasked()) hidden.emplace(source, bands, weights.masked);
}

TileStoreSetup BuildRun::StoreSetup() const {
    return {name, props.samples, props.lines, maxLevel, pixelBytes, props.bands};
}

PixelWorkSetup BuildRun::WorkSetup() const {
    return {props,
            weights,
            resampling,
            lanes,
            std::max(options.bins, 1u),
            options.statistics,
            options.memory / 8};
}

void BuildRun::Plan() {
    const std::uint64_t besides = TileStore::WorkMemory(StoreSetup()) + work->StatisticsMemory() +
                                  (hidden ? HiddenSamples::WorkMemory(weights.masked.size()) : 0);
    PlanInput input{props.samples, props.lines, maxLevel, ReductionHalo(resampling), 0, 0};
    input.pixelBytes = pixelBytes + (work->NeedsMasks() ? props.bands : 0);
    input.budget = options.memory - std::min(options.memory, besides);
    passes = PlanPasses(input);
    if (passes.empty())
        throw Error(name, "build it in " + std::to_string(options.memory) + " bytes of memory",
                    "it needs at least " + std::to_string(LeastMemory(input) + besides));
}

BuildReport BuildRun::Run() {
    BuildFile made(name, options.overwrite);
    LayOut(made);
    Finish();
    made.Commit();
    MakeReport();
    return std::move(report);
}

void BuildRun::LayOut(BuildFile& given) {
    file = &given;
    LayOut();
}

BuildReport BuildRun::Complete(BuildFile& laidOut) {
    file = &laidOut;
    inPlace = true;
    Reopen();
    Finish();
    MakeReport();
    return std::move(report);
}

void BuildRun::Finish() {
    Prepare();
    RunWithThreads(threads, [this] { Fill(); });
    StoreRecords();
    Check();
    if (!options.beforeNaming) return;
    options.beforeNaming(file->Path());
    // It may have put something in.
    report.fileSize = PyramidHeader::Read(file->Path()).fileSize;
}

void BuildRun::MakeReport() {
    report.width = props.samples;
    report.height = props.lines;
    report.bands = props.bands;
    report.maxLevel = maxLevel;
    report.resampling = resampling;
    report.peakMemory = meter.Peak();
    report.seconds =
        std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

// Room for the documents, generously: 21 bytes for a count, and the tags of a record.
std::uint64_t BuildRun::MetadataBound() const {
    std::uint64_t bound = 65536;
    bound += props.bands * (4096 + 21 * std::uint64_t{std::max(options.bins, 256u)});
    for (const std::uint32_t count : colors) bound += 64 * std::uint64_t{count};
    return bound;
}

void BuildRun::LayOut() {
    std::uint64_t tileBytes = 0;
    for (std::uint32_t level = 0; level <= maxLevel; ++level)
        tileBytes +=
            zelm::LevelGeometry::LevelPixels(props.samples, props.lines, level) * pixelBytes;
    file->CheckSpace(tileBytes + MetadataBound());
    zelm::RasterProps plain = props;
    plain.noDataValues.clear();
    raster.emplace(Raster::Create(module, file->Path(), plain, maxLevel));
    if (raster->Header().tileOrdering != report.tileOrdering)
        throw Error(name, "lay it out", "the module chose another tile ordering");
    file->Reserve(raster->Header().tileDataEnd + MetadataBound());
}

// What the layout did not know yet, as the colours of palettes, takes room too.
void BuildRun::Reopen() {
    raster.emplace(Raster::Open(module, file->Path()));
    const PyramidHeader& header = raster->Header();
    if (header.width != props.samples || header.height != props.lines ||
        header.bandCount != props.bands || header.pixelType != props.pixelType ||
        header.levelMin != 0 || header.levelMax != maxLevel ||
        header.tileOrdering != report.tileOrdering)
        throw Error(name, "build it", "its file is laid out for another raster");
    if (!PresentTiles(header).Have(0, {0, 0, props.samples, props.lines}, raster->AllBands(),
                                   header.fileSize))
        throw Error(name, "build it", "pixels of level 0 are missing");
    file->Reserve(header.tileDataEnd + MetadataBound());
    file->BeginFlush();
}

void BuildRun::Prepare() {
    work = MakePixelWork(*raster, WorkSetup());
    meter.Add(work->StatisticsMemory());
    if (hidden) meter.Add(HiddenSamples::WorkMemory(weights.masked.size()));
    Plan();
    tiles.emplace(StoreSetup(), *work, meter);
}

void BuildRun::Fill() {
    progress.total = std::uint64_t{props.samples} * props.lines;
    if (work->NeedsSecondWalk()) progress.total *= 2;
    if (inPlace && maxLevel == 0 && !options.statistics) return;
    for (const Pass& pass : passes) WalkPass(pass);
    if (work->NeedsSecondWalk()) CountLevel0();
}

void BuildRun::WalkPass(const Pass& pass) {
    std::uint64_t widest = 0;
    for (const Column& column : pass.columns)
        widest = std::max<std::uint64_t>(widest, column.readEnd - column.readBegin);
    StripStore store(meter, pass.baseLevel, pass.topLevel, widest, pixelBytes,
                     work->NeedsMasks() ? props.bands : 0);
    for (const Column& column : pass.columns) WalkColumn(pass, column, store);
}

void BuildRun::WalkColumn(const Pass& pass, const Column& column, StripStore& store) {
    LevelCascade cascade({pass.baseLevel, pass.topLevel, props.lines, props.bands, pixelBytes,
                          ReductionHalo(resampling), lanes},
                         column, *work, store, meter);
    const std::uint32_t height = props.lines >> pass.baseLevel;
    // The jobs are kept here, since a cancelled pipeline drops what is under way in it. Jobs end in
    // order, so the place of a new one is free.
    std::vector<Job> jobs(pass.stripsAhead);
    std::uint32_t nextLine = 0;
    const auto read = [&](tbb::flow_control& control) -> Job* {
        if (nextLine >= height) {
            control.stop();
            return nullptr;
        }
        Job& job = jobs[nextLine / kTileSide % jobs.size()];
        job.base = store.Take(pass.baseLevel);
        job.base->Begin(nextLine, std::min(kTileSide, height - nextLine),
                        column.readEnd - column.readBegin);
        nextLine = job.base->End();
        ReadStrip(pass, column, *job.base);
        return &job;
    };
    const auto reduce = [&](Job* job) {
        LookAtStrip(pass, column, *job->base);
        cascade.Take(*job->base, job->finished);
        return job;
    };
    const auto write = [&](Job* job) {
        if (pass.baseLevel == 0 && !inPlace) WriteStrip(pass, column, *job->base);
        for (const StripStore::Loan& strip : job->finished) WriteStrip(pass, column, *strip);
        const std::uint32_t lines = job->base->lines;
        *job = Job();
        if (pass.baseLevel == 0) Advance(std::uint64_t{lines} * (column.end - column.begin));
    };
    tbb::parallel_pipeline(
        pass.stripsAhead,
        tbb::make_filter<void, Job*>(tbb::filter_mode::serial_in_order, read) &
            tbb::make_filter<Job*, Job*>(tbb::filter_mode::serial_in_order, reduce) &
            tbb::make_filter<Job*, void>(tbb::filter_mode::serial_in_order, write));
}

void BuildRun::ReadStrip(const Pass& pass, const Column& column, Strip& strip) {
    const Window window{column.readBegin, strip.firstLine, strip.width, strip.lines};
    std::byte* const pixels = strip.Row(strip.firstLine);
    if (pass.baseLevel == 0 && !inPlace)
        source.Read(window, bands, pixels);
    else
        tiles->Read(pass.baseLevel, window, pixels);
    if (!hidden) return;
    unsigned char* const mask = strip.MaskRow(strip.firstLine);
    std::memset(mask, 0, strip.MaskRowBytes() * strip.lines);
    hidden->Mark(pass.baseLevel, window, mask);
}

// Masks of a base strip, and its statistics, of what the column owns.
void BuildRun::LookAtStrip(const Pass& pass, const Column& column, Strip& strip) {
    const bool counts = pass.baseLevel == 0 && options.statistics;
    if (!counts && !work->NeedsMasks()) return;
    const std::uint32_t margin = column.begin - column.readBegin;
    const std::size_t skippedBytes = std::size_t{margin} * pixelBytes;
    const std::size_t skippedMask = std::size_t{margin} * props.bands;
    InLanes(lanes, strip.firstLine, strip.End(),
            [&](std::uint32_t lane, std::uint32_t first, std::uint32_t last) {
                for (std::uint32_t line = first; line < last; ++line) {
                    if (work->NeedsMasks())
                        strip.SetMarked(
                            line, work->MarkRow(strip.Row(line), strip.MaskRow(line), strip.width));
                    const unsigned char* const mask = strip.MaskIfMarked(line);
                    if (counts)
                        work->TakeStatistics(lane, strip.Row(line) + skippedBytes,
                                             mask ? mask + skippedMask : nullptr,
                                             column.end - column.begin);
                }
            });
}

void BuildRun::WriteStrip(const Pass& pass, const Column& column, const Strip& strip) {
    const std::uint32_t above = strip.level - pass.baseLevel;
    tiles->Write(strip, column.readBegin >> above, column.begin >> above, column.end >> above);
}

// Level 0 once more, for the types whose bins depend on minimum and maximum.
void BuildRun::CountLevel0() {
    work->BeginSecondWalk();
    const std::size_t tileBytes = std::size_t{kTileSide} * kTileSide * pixelBytes;
    const std::size_t atOnce = std::max<std::size_t>(1, kChunkBytes / tileBytes);
    const MeteredBytes pixels(meter, atOnce * tileBytes);
    const std::size_t maskRow = std::size_t{kTileSide} * props.bands;
    const MeteredBytes masks(meter, lanes * maskRow);
    for (std::uint32_t row = 0; row < tiles->TilesDown(0); ++row)
        for (std::uint32_t column = 0; column < tiles->TilesAcross(0);) {
            std::vector<Window> chunk;
            for (; chunk.size() < atOnce && column < tiles->TilesAcross(0); ++column) {
                chunk.push_back(tiles->Tile(0, column, row));
                tiles->ReadTile(0, chunk.back(), pixels.Data() + (chunk.size() - 1) * tileBytes);
            }
            InLanes(
                lanes, 0, chunk.front().height,
                [&](std::uint32_t lane, std::uint32_t first, std::uint32_t last) {
                    auto* const mask = static_cast<unsigned char*>(
                        static_cast<void*>(masks.Data() + lane * maskRow));
                    std::memset(mask, 0, maskRow);
                    for (std::size_t i = 0; i < chunk.size(); ++i)
                        for (std::uint32_t line = first; line < last; ++line) {
                            const std::byte* const samples =
                                pixels.Data() + i * tileBytes +
                                std::size_t{line} * chunk[i].width * pixelBytes;
                            const bool any =
                                work->NeedsMasks() && work->MarkRow(samples, mask, chunk[i].width);
                            work->TakeCounts(lane, samples, any ? mask : nullptr, chunk[i].width);
                        }
                });
            for (const Window& tile : chunk) Advance(std::uint64_t{tile.width} * tile.height);
        }
}

void BuildRun::StoreRecords() {
    const std::vector<FullStatistics> stored = work->StoreStatistics();
    if (options.takeStatistics && !stored.empty()) options.takeStatistics(stored);
    for (std::uint32_t i = 0; i < bands.size(); ++i)
        if (colors[i] != 0)
            if (const zelm::PalettePtr palette = source.BandPalette(bands[i]))
                raster->SetBandPalette(i, *palette);
}

// Looks at the file as the next user will: from the disk, through a new connection.
void BuildRun::Check() {
    if (!raster->IsComplete())
        throw Error(
            name, "finish it",
            std::to_string(raster->Header().BytesMissing()) + " bytes did not reach the file");
    file->Flush();
    const std::uint32_t lastBand = props.bands - 1;
    const bool hasRecords = raster->HasStatistics(lastBand);
    tiles.reset();
    work.reset();
    raster.reset();
    Raster finished = Raster::Open(module, file->Path(), Access::Read);
    report.fileSize = finished.Header().fileSize;
    if (!finished.IsComplete() || finished.Width() != props.samples ||
        finished.Height() != props.lines || finished.MaxLevel() != maxLevel ||
        finished.HasStatistics(lastBand) != hasRecords)
        throw Error(name, "finish it", "what was written does not read back as it was meant");
}

void BuildRun::Advance(std::uint64_t pixels) {
    progress.done += pixels;
    if (options.progress && !options.progress(progress)) throw Cancelled(name, "build it");
}

}  // namespace

void PyramidBuilder::Check(RasterSource& source, const std::string& target,
                           const BuildOptions& options) const {
    const BuildRun run(module, source, target, options);
}

void PyramidBuilder::LayOut(RasterSource& source, BuildFile& file, const std::string& target,
                            const BuildOptions& options) const {
    BuildRun(module, source, target, options).LayOut(file);
}

BuildReport PyramidBuilder::Complete(RasterSource& source, BuildFile& file,
                                     const std::string& target, const BuildOptions& options) const {
    return BuildRun(module, source, target, options).Complete(file);
}

BuildReport PyramidBuilder::Build(RasterSource& source, const std::string& target,
                                  const BuildOptions& options) const {
    BuildRun run(module, source, target, options);
    return run.Run();
}

}  // namespace zmchost
