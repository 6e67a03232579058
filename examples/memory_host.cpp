// A host that hands the module a raster of its own: the geoid grid and its two slopes, three bands
// of 32-bit floats in a buffer. It reads tiles in several interleaves and band lists with masks,
// writes a tile back, and draws what came through the module.
//
// Usage: memory_host MODULE GRID PICTURE
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

constexpr std::uint32_t kBands = 3;

// Place of a sample in a buffer of the given interleave; the layout of rasters and tiles alike.
std::size_t IndexOf(std::int32_t interleave, std::uint32_t width, std::uint32_t height,
                    std::uint32_t bands, std::uint32_t x, std::uint32_t y, std::uint32_t band) {
    if (interleave == Interleave::BIP) return (std::size_t{y} * width + x) * bands + band;
    if (interleave == Interleave::BIL) return (std::size_t{y} * bands + band) * width + x;
    return (std::size_t{band} * height + y) * width + x;
}

// Heights in band 0, slope to the east in band 1, slope to the south in band 2.
std::vector<float> MakeBands(const Heights& heights, std::int32_t interleave) {
    std::vector<float> pixels(heights.values.size() * kBands);
    for (std::uint32_t y = 0; y < heights.height; ++y) {
        for (std::uint32_t x = 0; x < heights.width; ++x) {
            const auto at = [&](std::uint32_t column, std::uint32_t row) {
                return heights.values[std::size_t{row} * heights.width + column];
            };
            const float value = at(x, y);
            const float samples[kBands] = {value, at((x + 1) % heights.width, y) - value,
                                           y + 1 == heights.height ? 0 : at(x, y + 1) - value};
            for (std::uint32_t b = 0; b < kBands; ++b)
                pixels[IndexOf(interleave, heights.width, heights.height, kBands, x, y, b)] =
                    samples[b];
        }
    }
    return pixels;
}

// The module takes the address of the buffer as text. Such a text is made here, in the process that
// owns the buffer, and must never be taken from outside it.
String DescribeRaster(const Heights& heights, std::int32_t interleave, float* pixels) {
    char text[256];
    static_cast<void>(std::snprintf(
        text, sizeof text,
        "SAMPLES=%" PRIu32 ";LINES=%" PRIu32 ";BANDS=%" PRIu32 ";INTERLEAVE=%d;PIXELTYPE=%" PRIu32
        ";PIXELSIZE=0.25,0.25;TIEPTMAP=-180.125,90.125;NAME=geoid;PIXELDATA=%p",
        heights.width, heights.height, kBands, interleave, PixelTypeCode::Single,
        static_cast<void*>(pixels)));
    return String(text);
}

DataConnectionPtr OpenRaster(examples::Host& host, const String& description) {
    Array<String> argument;
    argument.Append("MemoryRaster");
    argument.Append(description);
    DataConnectionPtr connection =
        host.Factory().Open(argument, GeoRefPtr(), MetadataPtr(new Metadata));
    if (!connection) Fail("the raster does not open");
    return connection;
}

struct Summary {
    std::uint64_t valid = 0;
    double minimum = 0, maximum = 0, sum = 0;

    void Add(double value) {
        minimum = valid == 0 ? value : std::min(minimum, value);
        maximum = valid == 0 ? value : std::max(maximum, value);
        sum += value;
        ++valid;
    }
};

// Reads band 0 line by line through the module, as a host with little memory would.
Summary ReadHeightBand(RasterReader<float>& reader, std::vector<float>& values) {
    const std::uint32_t width = reader.GetSamples(0), height = reader.GetLines(0);
    values.resize(std::size_t{width} * height);
    std::vector<unsigned char> mask(width, 0);
    Summary summary;
    for (std::uint32_t y = 0; y < height; ++y) {
        float* line = &values[std::size_t{y} * width];
        if (!reader.ReadTile(0, static_cast<int>(y), width, 1, BandList{0}, 0, line, mask.data()))
            Fail("a line cannot be read");
        for (std::uint32_t x = 0; x < width; ++x)
            if ((mask[x] & 1) == 0) summary.Add(static_cast<double>(line[x]));
    }
    return summary;
}

// Reads one window with the band list (2, 0); its checksum does not depend on the interleave.
double WindowChecksum(RasterReader<float>& reader) {
    constexpr std::uint32_t width = 300, height = 200;
    std::vector<float> tile(std::size_t{width} * height * 2);
    std::vector<unsigned char> mask(tile.size(), 0);
    if (!reader.ReadTile(500, 250, width, height, BandList{2, 0}, 0, tile.data(), mask.data()))
        Fail("the window cannot be read");
    const std::int32_t interleave = reader.GetRasterProps().interleave;
    double sum = 0;
    for (std::uint32_t y = 0; y < height; ++y)
        for (std::uint32_t x = 0; x < width; ++x)
            sum += static_cast<double>(tile[IndexOf(interleave, width, height, 2, x, y, 0)]) +
                   2 * static_cast<double>(tile[IndexOf(interleave, width, height, 2, x, y, 1)]);
    return sum;
}

// Masks a window out, writes it, counts what is left, and puts the pixels back. Returns the samples
// that were out.
std::uint64_t MaskOutAndRestore(RasterReader<float>& reader, std::vector<float>& values) {
    constexpr std::uint32_t width = 64, height = 32;
    std::vector<float> before(std::size_t{width} * height), stamped;
    std::vector<unsigned char> mask(before.size(), 0);
    reader.ReadTile(100, 100, width, height, BandList{0}, 0, before.data(), mask.data());
    const std::uint64_t full = ReadHeightBand(reader, values).valid;
    stamped = before;
    std::fill(mask.begin(), mask.end(), static_cast<unsigned char>(1));
    if (!reader.WriteTile(100, 100, width, height, BandList{0}, 0, stamped.data(), mask.data()))
        Fail("the tile cannot be written");
    const std::uint64_t left = ReadHeightBand(reader, values).valid;
    std::fill(mask.begin(), mask.end(), static_cast<unsigned char>(0));
    reader.WriteTile(100, 100, width, height, BandList{0}, 0, before.data(), mask.data());
    return full - left;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 4) Fail("usage: memory_host MODULE GRID PICTURE");
    examples::Host host(argv[1], "MemoryRaster");
    const Heights grid = examples::ReadHeights(argv[2]);

    Heights seen = grid;
    Summary summary;
    std::uint64_t maskedOut = 0;
    RasterProps noData;
    noData.SetBands(kBands);
    noData.SetNoDataValue(0, grid.noData);
    for (const std::int32_t interleave : {Interleave::BIP, Interleave::BIL, Interleave::BSQ}) {
        std::vector<float> pixels = MakeBands(grid, interleave);
        DataConnectionPtr connection =
            OpenRaster(host, DescribeRaster(grid, interleave, pixels.data()));
        auto& raster = static_cast<RasterDataConnection&>(*connection);
        RasterReader<float>& reader = *raster.GetReader()->As<float>();
        reader.SetNoDataValues(noData);
        maskedOut = MaskOutAndRestore(reader, seen.values);
        summary = ReadHeightBand(reader, seen.values);
        std::printf("%s: checksum of a window in the bands (2, 0): %.3f\n",
                    InterleaveName(interleave), WindowChecksum(reader));
    }
    std::printf("size %" PRIu32 " x %" PRIu32 "\ntype %s\n", grid.width, grid.height,
                PixelTypeName(PixelTypeCode::Single));
    std::printf("valid samples %" PRIu64 " (%" PRIu64 " fewer while a tile was masked out)\n",
                summary.valid, maskedOut);
    std::printf("minimum %.3f\nmaximum %.3f\nmean %.3f\n", summary.minimum, summary.maximum,
                summary.sum / static_cast<double>(summary.valid));
    examples::WriteShadedPicture(argv[3], seen);
    return 0;
}
