#include "host/build/BuildRun.h"

#include <oneapi/tbb/parallel_pipeline.h>

#include <algorithm>
#include <bit>
#include <cstring>

#include "core/PixelVocabulary.h"
#include "format/DocumentLimits.h"
#include "host/base/Checksum.h"
#include "host/base/Lanes.h"
#include "host/base/PackedNumbers.h"
#include "host/base/Threads.h"
#include "host/build/LevelCascade.h"
#include "host/file/PresentTiles.h"

namespace zmchost {
namespace {

namespace tbb = oneapi::tbb;

// Bytes of tiles that the second walk over level 0 reads at a time: well below the least budget.
constexpr std::size_t kChunkBytes = std::size_t{4} << 20;

// What an area of level 0 is at a level.
Window LevelArea(const Window& area, std::uint32_t level) {
    return {area.x >> level, area.y >> level,
            static_cast<std::uint32_t>((area.Right() >> level) - (area.x >> level)),
            static_cast<std::uint32_t>((area.Bottom() >> level) - (area.y >> level))};
}

// Whether a strip, of any level, is what a pass is made for, and not read around it.
bool Owns(const Pass& pass, const Strip& strip) {
    const std::uint32_t above = strip.level - pass.baseLevel;
    return strip.firstLine >= pass.lines.begin >> above &&
           strip.firstLine < pass.lines.end >> above;
}

}  // namespace

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
            inParts ? options.memory / 16 * lanes : options.memory / 8};
}

void BuildRun::Plan() {
    const std::uint64_t besides = TileStore::WorkMemory(StoreSetup()) + work->StatisticsMemory() +
                                  (hidden ? HiddenSamples::WorkMemory(weights.masked.size()) : 0);
    PlanInput input{props.samples, props.lines, maxLevel, ReductionHalo(resampling), 0, 0};
    input.pixelBytes = pixelBytes + (work->NeedsMasks() ? props.bands : 0);
    input.budget = options.memory - std::min(options.memory, besides);
    // What more threads count in must not make other parts.
    if (inParts) input.budget = std::max(input.budget, options.memory / 2);
    planInput = input;
    passes = PlanPasses(input);
    if (passes.empty())
        throw Error(name, "build it in " + std::to_string(options.memory) + " bytes of memory",
                    "it needs at least " + std::to_string(LeastMemory(input) + besides));
}

BuildReport BuildRun::Run() {
    BuildFile made(name, options.overwrite);
    if (!options.flush) made.LeaveToSystem();
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
    StoreAll();
}

void BuildRun::StoreAll() {
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

void BuildRun::Open(const std::string& path) {
    raster.emplace(Raster::Open(module, path));
    CheckLayout();
}

void BuildRun::CheckLayout() const {
    const PyramidHeader& header = raster->Header();
    if (header.width != props.samples || header.height != props.lines ||
        header.bandCount != props.bands || header.pixelType != props.pixelType ||
        header.levelMin != 0 || header.levelMax != maxLevel ||
        header.tileOrdering != report.tileOrdering)
        throw Error(name, "build it", "its file is laid out for another raster");
}

// What the layout did not know yet, as the colours of palettes, takes room too.
void BuildRun::Reopen() {
    Open(file->Path());
    const PyramidHeader& header = raster->Header();
    if (!PresentTiles(header).Have(0, Everything(), raster->AllBands(), header.fileSize))
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
    if (!work->NeedsSecondWalk()) return;
    work->BeginSecondWalk();
    CountLevel0(Everything());
}

StripStore& BuildRun::StripsFor(const Pass& pass) {
    std::uint64_t widest = 0;
    for (const Column& column : pass.columns)
        widest = std::max<std::uint64_t>(widest, column.readEnd - column.readBegin);
    if (strips && strips->Serves(pass.baseLevel, pass.topLevel, widest)) return *strips;
    strips.reset();
    strips = std::make_unique<StripStore>(meter, pass.baseLevel, pass.topLevel, widest, pixelBytes,
                                          work->NeedsMasks() ? props.bands : 0);
    return *strips;
}

void BuildRun::WalkPass(const Pass& pass) {
    StripStore& store = StripsFor(pass);
    for (const Column& column : pass.columns) WalkColumn(pass, column, store);
    if (!inParts) strips.reset();
}

void BuildRun::WalkColumn(const Pass& pass, const Column& column, StripStore& store) {
    const Span& lines = pass.lines;
    LevelCascade cascade({pass.baseLevel, pass.topLevel, lines.readBegin, lines.readEnd,
                          props.bands, pixelBytes, ReductionHalo(resampling), lanes},
                         column, *work, store, meter);
    // The jobs are kept here, since a cancelled pipeline drops what is under way in it. Jobs end in
    // order, so the place of a new one is free.
    std::vector<Job> jobs(pass.stripsAhead);
    std::uint32_t nextLine = lines.readBegin;
    const auto read = [&](tbb::flow_control& control) -> Job* {
        if (nextLine >= lines.readEnd) {
            control.stop();
            return nullptr;
        }
        Job& job = jobs[nextLine / kTileSide % jobs.size()];
        job.base = store.Take(pass.baseLevel);
        job.base->Begin(nextLine, StripLines(nextLine, lines.readEnd),
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
        const std::uint32_t passed = Owns(pass, *job->base) ? job->base->lines : 0;
        *job = Job();
        if (pass.baseLevel == FirstBase())
            Advance(std::uint64_t{passed} * (column.end - column.begin) << 2 * pass.baseLevel);
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
    const bool counts = pass.baseLevel == 0 && options.statistics && !gathered && Owns(pass, strip);
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
    if (!Owns(pass, strip)) return;
    const std::uint32_t above = strip.level - pass.baseLevel;
    tiles->Write(strip, column.readBegin >> above, column.begin >> above, column.end >> above);
}

// Level 0 once more, for the types whose bins depend on minimum and maximum; of an area of whole
// tiles.
void BuildRun::CountLevel0(const Window& area) { WalkLevel0(area, *work, &PixelWork::TakeCounts); }

// The tiles of an area as they stand in the file, for one who gathers something of their rows.
void BuildRun::WalkLevel0(const Window& area, PixelWork& gatherer, TakeRow take) {
    const std::size_t tileBytes = std::size_t{kTileSide} * kTileSide * pixelBytes;
    const std::size_t atOnce = std::max<std::size_t>(1, kChunkBytes / tileBytes);
    const MeteredBytes pixels(meter, atOnce * tileBytes);
    const std::size_t maskRow = std::size_t{kTileSide} * props.bands;
    const MeteredBytes masks(meter, lanes * maskRow);
    const auto endColumn = static_cast<std::uint32_t>((area.Right() + kTileSide - 1) / kTileSide);
    const auto endRow = static_cast<std::uint32_t>((area.Bottom() + kTileSide - 1) / kTileSide);
    for (std::uint32_t row = area.y / kTileSide; row < endRow; ++row)
        for (std::uint32_t column = area.x / kTileSide; column < endColumn;) {
            std::vector<Window> chunk;
            for (; chunk.size() < atOnce && column < endColumn; ++column) {
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
                            (gatherer.*take)(lane, samples, any ? mask : nullptr, chunk[i].width);
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

void BuildRun::OpenParts(const std::string& laidOut) {
    inParts = true;
    Open(laidOut);
}

void BuildRun::PrepareOnce() {
    if (!work) Prepare();
}

// A number for all that the source told and the options settled, but pixels.
std::uint64_t BuildRun::Facts() const {
    NumberPacker facts;
    for (const std::uint64_t number :
         {std::uint64_t{props.samples}, std::uint64_t{props.lines}, std::uint64_t{props.pixelType},
          std::uint64_t{maxLevel}, static_cast<std::uint64_t>(resampling),
          std::uint64_t{report.tileOrdering}, std::uint64_t{options.bins}})
        facts.Put(number);
    for (std::size_t i = 0; i < bands.size(); ++i) {
        facts.Put(std::uint64_t{bands[i]});
        facts.Put(std::uint64_t{colors[i]});
        facts.Put(std::uint64_t{weights.alpha[i]});
    }
    for (const std::uint32_t place : weights.masked) facts.Put(std::uint64_t{place});
    for (const auto& [band, value] : props.noDataValues) {
        facts.Put(std::uint64_t{band});
        facts.Put(std::bit_cast<std::uint64_t>(value));
    }
    return Checksum(facts.Bytes());
}

PartGrid BuildRun::PlanGrid(std::uint32_t partWidth, std::uint32_t partHeight) {
    PrepareOnce();
    return PlanParts(planInput, partWidth, partHeight);
}

PartResult BuildRun::MakePart(const PartGrid& grid, std::uint64_t part) {
    Prepare();
    passes = {PlanPart(planInput, grid, part)};
    if (passes.front().memory > planInput.budget)
        throw Error(name, "build a part in " + std::to_string(options.memory) + " bytes of memory",
                    "its strips alone need " + std::to_string(passes.front().memory));
    progress = {0, grid.Area(part).Pixels()};
    tiles->SumLevel(grid.level);
    RunWithThreads(threads, [this] { WalkPass(passes.front()); });
    PartResult result{tiles->Sum(), work->SaveSums()};
    tiles.reset();
    work.reset();
    return result;
}

bool BuildRun::TakeSums(const std::string& packed) {
    PrepareOnce();
    gathered = true;
    return work->MergeSums(packed);
}

std::uint64_t BuildRun::TilesOf(const PartGrid& grid, std::uint64_t part) {
    PrepareOnce();
    const Window area = grid.Area(part);
    return tiles->SumOf(grid.level, LevelArea(area, grid.level));
}

void BuildRun::BeginCounts() {
    PrepareOnce();
    if (work->NeedsSecondWalk()) work->BeginSecondWalk();
}

std::string BuildRun::CountPart(const PartGrid& grid, std::uint64_t part) {
    const Window area = grid.Area(part);
    work->ClearCounts();
    progress = {0, area.Pixels()};
    RunWithThreads(threads, [&] { CountLevel0(area); });
    std::string counts = work->SaveCounts();
    // Whoever takes them takes them once.
    work->ClearCounts();
    return counts;
}

BuildReport BuildRun::FinishParts(BuildFile& laidOut, const PartGrid& grid,
                                  const std::vector<std::uint64_t>& uncounted) {
    file = &laidOut;
    inPlace = true;
    passes = grid.level < maxLevel ? PlanPasses(planInput, grid.level) : std::vector<Pass>();
    progress = {0, passes.empty() ? 0 : Everything().Pixels()};
    for (const std::uint64_t part : uncounted) progress.total += grid.Area(part).Pixels();
    file->BeginFlush();
    RunWithThreads(threads, [&] {
        for (const Pass& pass : passes) WalkPass(pass);
        for (const std::uint64_t part : uncounted) CountLevel0(grid.Area(part));
    });
    StoreAll();
    MakeReport();
    return std::move(report);
}

void BuildRun::Advance(std::uint64_t pixels) {
    progress.done += pixels;
    if (options.progress && !options.progress(progress)) throw Cancelled(name, "build it");
}

}  // namespace zmchost
