// A host that makes a pyramid file of the geoid grid through the module, and reads it again.
//
// The module lays out the file and moves the tiles; the levels, plain means of 2 x 2 pixels, and
// the statistics are this host's own work.
//
// Usage: pyramid_host MODULE GRID FILE PICTURE-PREFIX
#include <xercesc/util/PlatformUtils.hpp>

#include <algorithm>
#include <array>
#include <cinttypes>
#include <cmath>
#include <cstdio>

#include "core/PixelVocabulary.h"
#include "examples/Examples.h"

using examples::BandList;
using examples::Fail;
using examples::Heights;
using namespace zelm;

namespace {

constexpr std::uint32_t kTile = 256;
constexpr int kMaxLevel = 2;
constexpr std::uint32_t kBins = 64;

// Half the size; an odd last column or row has no counterpart.
Heights HalfSize(const Heights& fine) {
    Heights coarse;
    coarse.width = fine.width / 2;
    coarse.height = fine.height / 2;
    coarse.values.resize(std::size_t{coarse.width} * coarse.height);
    for (std::uint32_t y = 0; y < coarse.height; ++y) {
        const float* upper = &fine.values[std::size_t{y} * 2 * fine.width];
        const float* lower = upper + fine.width;
        for (std::size_t x = 0; x < coarse.width; ++x)
            coarse.values[std::size_t{y} * coarse.width + x] =
                (upper[2 * x] + upper[2 * x + 1] + lower[2 * x] + lower[2 * x + 1]) / 4;
    }
    return coarse;
}

Array<String> PyramidArgument(const char* file) {
    Array<String> argument;
    argument.Append("Pyramid");
    argument.Append(file);
    return argument;
}

RasterReader<float>& ReaderOf(const DataConnectionPtr& connection) {
    auto& raster = static_cast<RasterDataConnection&>(*connection);
    RasterReader<float>* reader = raster.GetReader()->As<float>().Get();
    if (!reader) Fail("no reader of 32-bit floats");
    return *reader;
}

// Writes one level tile by tile: whole tiles are what every ordering takes.
void WriteLevel(RasterReader<float>& reader, const Heights& level, int number) {
    std::vector<float> tile(std::size_t{kTile} * kTile);
    std::vector<unsigned char> mask(tile.size(), 0);
    for (std::uint32_t y = 0; y < level.height; y += kTile) {
        for (std::uint32_t x = 0; x < level.width; x += kTile) {
            const std::uint32_t width = std::min(kTile, level.width - x);
            const std::uint32_t height = std::min(kTile, level.height - y);
            for (std::uint32_t row = 0; row < height; ++row)
                std::copy_n(&level.values[std::size_t{y + row} * level.width + x], width,
                            &tile[std::size_t{row} * width]);
            if (!reader.WriteTile(static_cast<int>(x), static_cast<int>(y), width, height,
                                  BandList{0}, number, tile.data(), mask.data()))
                Fail("a tile cannot be written");
        }
    }
}

RasterBandStats<float> StatisticsOf(const Heights& heights) {
    RasterBandStats<float> stats;
    stats.flags = StatsFlag::All;
    const auto [low, high] = std::minmax_element(heights.values.begin(), heights.values.end());
    stats.minimum = *low;
    stats.maximum = *high;
    for (const float value : heights.values) {
        stats.sum += static_cast<double>(value);
        stats.sumOfSquares += static_cast<double>(value) * static_cast<double>(value);
    }
    const auto n = static_cast<double>(heights.values.size());
    stats.mean = stats.sum / n;
    stats.rootMeanSquare = std::sqrt(stats.sumOfSquares / n);
    stats.standardDeviation = std::sqrt(stats.sumOfSquares / n - stats.mean * stats.mean);
    return stats;
}

RasterBandHistogram<float> HistogramOf(const Heights& heights,
                                       const RasterBandStats<float>& stats) {
    RasterBandHistogram<float> histogram;
    histogram.binCount = kBins;
    histogram.minimum = stats.minimum;
    histogram.maximum = stats.maximum;
    histogram.binSize = static_cast<double>(stats.maximum - stats.minimum) / kBins;
    histogram.counts.SetShape(ArrayShape(kBins));
    std::fill_n(histogram.counts.data, kBins, std::uint64_t{0});
    for (const float value : heights.values) {
        const double bin = static_cast<double>(value - stats.minimum) / histogram.binSize;
        ++histogram.counts.data[std::min(kBins - 1, static_cast<std::uint32_t>(bin))];
    }
    return histogram;
}

// The colours of the histogram's bins, as a viewer would draw them.
void FillPalette(Palette& palette, const RasterBandHistogram<float>& histogram) {
    const double lowest = static_cast<double>(histogram.minimum);
    const double highest = static_cast<double>(histogram.maximum);
    for (std::uint32_t bin = 0; bin < kBins; ++bin) {
        const examples::Rgb c =
            examples::HeightColour(lowest + (bin + 0.5) * histogram.binSize, lowest, highest);
        std::array<unsigned char, 4> bytes = {c.red, c.green, c.blue, 255};
        palette.AddColor(RGBAColor(Array<unsigned char>(bytes.data(), ArrayShape(4))));
    }
}

void BuildPyramid(examples::Host& host, const char* file, const Heights& grid) {
    RasterProps props;
    props.samples = grid.width;
    props.lines = grid.height;
    props.bands = 1;
    props.tileSamples = props.tileLines = kTile;
    props.interleave = Interleave::BIP;
    props.pixelType = PixelTypeCode::Single;
    props.formatName = "Pyramid";
    const DataConnectionPtr connection = host.Factory().Create(PyramidArgument(file), props);
    if (!connection) Fail(std::string(file) + ": cannot be created");
    RasterReader<float>& reader = ReaderOf(connection);
    const std::int32_t pair[] = {2, 2};
    reader.BuildPyramid(0, kMaxLevel, 0, pair);

    Heights level = grid;
    for (int number = 0; number <= kMaxLevel; ++number) {
        WriteLevel(reader, level, number);
        level = HalfSize(level);
    }
    Array<RasterBandStats<float>> stats;
    stats.Append(StatisticsOf(grid));
    Array<RasterBandHistogram<float>> histograms;
    histograms.Append(HistogramOf(grid, stats.data[0]));
    Palette palette;
    FillPalette(palette, histograms.data[0]);
    reader.SetBandStats(stats);
    reader.SetHistograms(histograms);
    reader.SetPalette(0, palette);
    reader.RefreshPyramidState();
    if (!reader.HasPyramid()) Fail(std::string(file) + ": is not complete");
}

// Where the tile data starts, from the eight bytes behind the file's magic.
std::uint64_t TileDataStart(const char* file) {
    unsigned char head[12] = {};
    std::FILE* stream = std::fopen(file, "rb");
    if (!stream || std::fread(head, 1, sizeof head, stream) != sizeof head)
        Fail(std::string(file) + ": cannot be read");
    static_cast<void>(std::fclose(stream));
    std::uint64_t start = 0;
    for (int i = 11; i >= 4; --i) start = start << 8 | head[i];
    return start;
}

Heights ReadLevel(RasterReader<float>& reader, int number) {
    Heights level;
    level.width = reader.GetSamples(number);
    level.height = reader.GetLines(number);
    level.values.resize(std::size_t{level.width} * level.height);
    std::vector<unsigned char> mask(level.values.size(), 0);
    if (!reader.ReadTile(0, 0, level.width, level.height, BandList{0}, number, level.values.data(),
                         mask.data()))
        Fail("a level cannot be read");
    return level;
}

void ReadPyramid(examples::Host& host, const char* file, const std::string& pictures) {
    const DataConnectionPtr connection =
        host.Factory().Open(PyramidArgument(file), GeoRefPtr(), MetadataPtr(new Metadata));
    if (!connection) Fail(std::string(file) + ": cannot be opened");
    RasterReader<float>& reader = ReaderOf(connection);

    // The coarsest level comes first in the file.
    std::vector<std::uint64_t> offsets(static_cast<std::size_t>(reader.GetMaxLevel()) + 1);
    std::uint64_t offset = TileDataStart(file);
    for (int number = reader.GetMaxLevel(); number >= 0; --number) {
        offsets[static_cast<std::size_t>(number)] = offset;
        offset +=
            std::uint64_t{reader.GetSamples(number)} * reader.GetLines(number) * sizeof(float);
    }
    std::printf("level        size  tiles     offset      bytes\n");
    for (int number = 0; number <= reader.GetMaxLevel(); ++number) {
        const Heights level = ReadLevel(reader, number);
        const std::uint32_t tiles =
            ((level.width + kTile - 1) / kTile) * ((level.height + kTile - 1) / kTile);
        std::printf("%5d %5" PRIu32 " x %4" PRIu32 " %6" PRIu32 " %10" PRIu64 " %10zu\n", number,
                    level.width, level.height, tiles, offsets[static_cast<std::size_t>(number)],
                    level.values.size() * sizeof(float));
        examples::WriteShadedPicture(pictures + "-level" + std::to_string(number) + ".png", level);
    }
    const RasterBandStats<float> stats = reader.GetBandStats(0);
    std::printf("stored: minimum %.3f, maximum %.3f, mean %.3f, standard deviation %.3f\n",
                static_cast<double>(stats.minimum), static_cast<double>(stats.maximum), stats.mean,
                stats.standardDeviation);
    std::printf("stored: a histogram of %" PRIu32 " bins, a palette of %" PRIu32 " colours\n",
                reader.GetHistograms().data[0].binCount, reader.GetPalette(0)->nextIndex);
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 5) Fail("usage: pyramid_host MODULE GRID FILE PICTURE-PREFIX");
    xercesc::XMLPlatformUtils::Initialize();
    examples::Host host(argv[1], "Pyramid");
    BuildPyramid(host, argv[3], examples::ReadHeights(argv[2]));
    ReadPyramid(host, argv[3], argv[4]);
    return 0;
}
