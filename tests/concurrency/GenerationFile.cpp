#include "tests/concurrency/GenerationFile.h"

#include <algorithm>

namespace zmctest {
namespace {

constexpr std::uint32_t kGenerationBits = 12;
constexpr std::uint32_t kHistogramBands = 2;
constexpr std::uint32_t kBins = 32;
constexpr std::uint32_t kColors = 16;
constexpr std::uint32_t kTile = 256;

Sample Place(std::int32_t level, std::uint32_t x, std::uint32_t y, std::uint32_t band) {
    const std::uint32_t plane = static_cast<std::uint32_t>(level) * 16 + band;
    return (plane * 1000003u + y * 4099u + x * 13u + 1u) << kGenerationBits;
}

std::uint32_t MovingTileAt(std::int32_t level, std::uint32_t x, std::uint32_t y) {
    for (std::uint32_t i = 0; i < GenerationFile::kMovingTiles; ++i)
        if (GenerationFile::kMoving[i].level == level && GenerationFile::kMoving[i].Holds(x, y))
            return i;
    return GenerationFile::kMovingTiles;
}

zelm::RasterBandStats<Sample> StatisticsOf(std::uint32_t band, std::uint32_t generation) {
    zelm::RasterBandStats<Sample> stats;
    stats.band = band;
    stats.flags = zelm::StatsFlag::All;
    const std::uint32_t number = generation * 100 + band;
    stats.minimum = number;
    stats.maximum = number + 1;
    stats.mean = number + 0.25;
    stats.standardDeviation = number + 0.5;
    stats.sum = number * 1024.0;
    stats.sumOfSquares = number * 4096.0;
    stats.rootMeanSquare = number + 0.75;
    return stats;
}

bool Same(const zelm::RasterBandStats<Sample>& a, const zelm::RasterBandStats<Sample>& b) {
    const auto differ = [](double x, double y) { return x < y || x > y; };
    return a.band == b.band && a.flags == b.flags && a.minimum == b.minimum &&
           a.maximum == b.maximum && !differ(a.mean, b.mean) &&
           !differ(a.standardDeviation, b.standardDeviation) && !differ(a.sum, b.sum) &&
           !differ(a.sumOfSquares, b.sumOfSquares) && !differ(a.rootMeanSquare, b.rootMeanSquare);
}

zelm::RasterBandHistogram<Sample> HistogramOf(std::uint32_t band, std::uint32_t generation) {
    zelm::RasterBandHistogram<Sample> histogram;
    histogram.band = band;
    histogram.level = generation;
    histogram.minimum = generation;
    histogram.maximum = generation + 1;
    histogram.binSize = generation + 0.25;
    histogram.binCount = kBins;
    histogram.counts.SetShape(zelm::ArrayShape(kBins));
    for (std::uint32_t i = 0; i < kBins; ++i)
        histogram.counts.data[i] = std::uint64_t{generation} * 100000 + band * 1000 + i;
    return histogram;
}

bool Same(const zelm::RasterBandHistogram<Sample>& a, const zelm::RasterBandHistogram<Sample>& b) {
    return a.band == b.band && a.level == b.level && a.minimum == b.minimum &&
           a.maximum == b.maximum && !(a.binSize < b.binSize) && !(a.binSize > b.binSize) &&
           a.binCount == b.binCount && a.counts.shape.elements == kBins &&
           std::equal(b.counts.data, b.counts.data + kBins, a.counts.data);
}

void AddColors(zelm::Palette& palette, std::uint32_t generation) {
    for (std::uint32_t i = 0; i < kColors; ++i) {
        zelm::Color color;
        color.name = "generation";
        color.red = static_cast<std::uint8_t>(generation & 0xFF);
        color.green = static_cast<std::uint8_t>(generation >> 8);
        color.blue = static_cast<std::uint8_t>(i);
        color.alpha = 255;
        color.isNull = 0;
        palette.AddColor(color);
    }
}

}  // namespace

GenerationFile::GenerationFile(zmchost::ModulePtr loaded, const FileKind& kind,
                               const std::string& path)
    : module(std::move(loaded)) {
    zelm::RasterProps props;
    props.samples = kSamples;
    props.lines = kLines;
    props.bands = kind.bands;
    props.pixelType = zelm::ElementTraits<Sample>::code;
    props.interleave = 0;
    props.tileSamples = kTile;
    props.tileLines = kind.tileLines;
    connection = module->CreatePyramid(path, props);
    TakeReader();
    const std::int32_t pair[2] = {1, 1};
    if (!reader || !reader->BuildPyramid(0, kMaxLevel, 0, pair)) return;
    for (std::int32_t level = 0; level <= kMaxLevel; ++level) {
        const std::uint32_t width = kSamples >> level, height = kLines >> level;
        for (std::uint32_t y = 0; y < height; y += kTile)
            for (std::uint32_t x = 0; x < width; x += kTile)
                Write({level, x, y, std::min(kTile, width - x), std::min(kTile, height - y)}, 0);
    }
}

GenerationFile::GenerationFile(zmchost::ModulePtr loaded, const std::string& path)
    : module(std::move(loaded)) {
    connection = module->OpenPyramid(path);
    TakeReader();
}

void GenerationFile::TakeReader() {
    if (!connection) return;
    dispatch = connection->GetReader();
    if (!dispatch || !dispatch->As<Sample>()) return;
    reader = dispatch->As<Sample>().Get();
    bands = reader->GetBands();
    for (std::uint32_t band = 0; band < bands; ++band) allBands.push_back(static_cast<int>(band));
}

zelm::Array<int> GenerationFile::BandList() {
    return zelm::Array<int>(allBands.data(), zelm::ArrayShape(bands));
}

bool GenerationFile::Write(const Rectangle& tile, std::uint32_t generation) {
    std::vector<Sample> pixels;
    for (std::uint32_t y = tile.y; y < tile.y + tile.height; ++y)
        for (std::uint32_t x = tile.x; x < tile.x + tile.width; ++x)
            for (std::uint32_t band = 0; band < bands; ++band)
                pixels.push_back(Place(tile.level, x, y, band) | generation);
    std::vector<unsigned char> mask(pixels.size());
    return reader->WriteTile(static_cast<std::int32_t>(tile.x), static_cast<std::int32_t>(tile.y),
                             tile.width, tile.height, BandList(), tile.level, pixels.data(),
                             mask.data());
}

bool GenerationFile::WriteMoving(std::uint32_t tile, std::uint32_t generation) {
    return Write(kMoving[tile], generation);
}

bool GenerationFile::StoreStatistics(std::uint32_t generation) {
    zelm::Array<zelm::RasterBandStats<Sample>> stats;
    for (std::uint32_t band = 0; band < bands; ++band) stats.Append(StatisticsOf(band, generation));
    return reader->SetBandStats(stats);
}

bool GenerationFile::StoreHistograms(std::uint32_t generation) {
    zelm::Array<zelm::RasterBandHistogram<Sample>> histograms;
    for (std::uint32_t band = 0; band < kHistogramBands; ++band)
        histograms.Append(HistogramOf(band, generation));
    return reader->SetHistograms(histograms);
}

bool GenerationFile::StorePalette(std::uint32_t generation) {
    zelm::Palette palette;
    AddColors(palette, generation);
    return reader->SetPalette(0, palette);
}

GenerationFile::Seen GenerationFile::Look(const Rectangle& r) {
    Seen seen;
    std::fill_n(seen.lowest, kMovingTiles, kMaxGeneration);
    std::fill_n(seen.highest, kMovingTiles, 0u);
    std::vector<Sample> pixels(std::size_t{r.width} * r.height * bands);
    if (!reader->ReadTile(static_cast<std::int32_t>(r.x), static_cast<std::int32_t>(r.y), r.width,
                          r.height, BandList(), r.level, pixels.data(), nullptr)) {
        seen.fault = "a rectangle was refused";
        return seen;
    }
    const Sample* sample = pixels.data();
    for (std::uint32_t y = r.y; y < r.y + r.height; ++y)
        for (std::uint32_t x = r.x; x < r.x + r.width; ++x) {
            const std::uint32_t tile = MovingTileAt(r.level, x, y);
            for (std::uint32_t band = 0; band < bands; ++band, ++sample) {
                const std::uint32_t generation = *sample & kMaxGeneration;
                const bool inPlace = *sample - generation == Place(r.level, x, y, band);
                if (!inPlace || (tile == kMovingTiles && generation != 0)) {
                    seen.fault = "a sample of level " + std::to_string(r.level) + " at " +
                                 std::to_string(x) + ", " + std::to_string(y) + " is " +
                                 std::to_string(*sample);
                    return seen;
                }
                if (tile == kMovingTiles) continue;
                seen.lowest[tile] = std::min(seen.lowest[tile], generation);
                seen.highest[tile] = std::max(seen.highest[tile], generation);
            }
        }
    return seen;
}

std::optional<std::uint32_t> GenerationFile::CountHistograms(std::string& fault) {
    const zelm::Array<zelm::RasterBandHistogram<Sample>> all = reader->GetHistograms();
    const std::uint32_t count = all.shape.elements;
    if (count == 0) return {};
    if (count % kHistogramBands != 0) fault = "half a set of histograms";
    for (std::uint32_t i = 0; i < count; ++i)
        if (!Same(all.data[i], HistogramOf(i % kHistogramBands, i / kHistogramBands + 1)))
            fault = "histogram " + std::to_string(i) + " is a mixture";
    return count / kHistogramBands;
}

// Sets are stored before their histograms, so that there are as many or one more.
std::optional<std::uint32_t> GenerationFile::CountStatistics(std::uint32_t atLeast,
                                                             std::uint32_t probe,
                                                             std::string& fault) {
    if (!reader->HasBandStats(0)) return {};
    const auto isThere = [&](std::uint32_t place) {
        const zelm::RasterBandStats<Sample> record = reader->GetBandStats(place);
        if (record.flags == 0) return false;
        if (!Same(record, StatisticsOf(place % bands, place / bands + 1)))
            fault = "statistics record " + std::to_string(place) + " is a mixture";
        return true;
    };
    std::uint32_t sets = std::max(atLeast, 1u);
    if (!isThere(probe % (sets * bands)) || !isThere(sets * bands - 1))
        fault = "a statistics record is missing";
    while (isThere(sets * bands)) {
        if (!isThere(sets * bands + bands - 1)) fault = "half a set of statistics";
        ++sets;
    }
    return sets;
}

std::optional<std::uint32_t> GenerationFile::CountPalettes(std::string& fault) {
    const zelm::PalettePtr palette = reader->GetPalette(0);
    if (!palette) fault = "no palette";
    if (!palette || palette->nextIndex == 0) return {};
    if (palette->nextIndex != kColors) fault = "half a palette";
    const zelm::Color* const first = palette->GetColor(0);
    const std::uint32_t generation = first->red + first->green * 256u;
    for (std::uint32_t i = 0; i < kColors; ++i) {
        const zelm::Color* const color = palette->GetColor(i);
        if (color->red != first->red || color->green != first->green || color->blue != i ||
            color->alpha != 255)
            fault = "the palette is a mixture";
    }
    return generation;
}

GenerationFile::Sets GenerationFile::Count(std::uint32_t probe, std::string& fault) {
    Sets sets;
    sets.histograms = CountHistograms(fault);
    sets.statistics = CountStatistics(sets.histograms.value_or(0), probe, fault);
    sets.palettes = CountPalettes(fault);
    return sets;
}

}  // namespace zmctest
