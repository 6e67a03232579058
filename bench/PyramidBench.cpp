// What pyramid files cost, each figure beside its bound: opening beside the open of a GeoTIFF of
// the same size, transfers beside plain system calls for the same bytes.
//
// Both sides of a pair take turns within one loop, so that they see the same machine. The counters
// are the ones to read: "ours" and "bound" are the lower quartiles, which other work on the machine
// disturbs least, and "ratio" is bound / ours: 1 is as fast as the bound, more is faster.
#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <gdal_priv.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <vector>
#include <xercesc/util/PlatformUtils.hpp>

#include "format/TileTable.h"
#include "pyramid/PyramidDataset.h"
#include "pyramid/TileGather.h"
#include "pyramid/TileRequest.h"

namespace {

using zelm::PyramidDataset;
using Bytes = std::vector<unsigned char>;

constexpr std::uint32_t kTile = 256;

// A folder that goes with the program.
class Folder {
public:
    Folder() {
        std::string pattern = (std::filesystem::temp_directory_path() / "zmcbenchXXXXXX").string();
        path = mkdtemp(pattern.data());
    }
    ~Folder() { std::filesystem::remove_all(path); }
    std::filesystem::path path;
};

std::string PathOf(const std::string& name) {
    static const Folder folder;
    return (folder.path / name).string();
}

class List {
public:
    explicit List(std::uint32_t count) : bands(count) {
        for (std::uint32_t i = 0; i < count; ++i) bands[i] = static_cast<int>(i);
    }
    zelm::Array<int> View() {
        return {bands.data(), zelm::ArrayShape(static_cast<std::uint32_t>(bands.size()))};
    }

private:
    std::vector<int> bands;
};

std::unique_ptr<PyramidDataset> Create(const std::string& name, std::uint32_t samples,
                                       std::uint32_t lines, std::uint32_t bands,
                                       std::uint32_t levelMax, std::uint32_t ordering,
                                       std::uint32_t tile = kTile) {
    zelm::RasterProps props;
    props.samples = samples;
    props.lines = lines;
    props.bands = bands;
    props.pixelType = 1;
    props.interleave = 0;
    auto dataset = std::make_unique<PyramidDataset>(zelm::String(PathOf(name).c_str()), props);
    dataset->TileOrdering = ordering;
    dataset->TileSize = tile;
    dataset->CreateFile(0, levelMax);
    return dataset;
}

// Level 0 of a file, tile by tile.
void Fill(PyramidDataset& dataset) {
    List list(dataset.BandCount);
    Bytes pixels(std::size_t{kTile} * kTile * dataset.BandCount);
    for (std::size_t i = 0; i < pixels.size(); ++i) pixels[i] = static_cast<unsigned char>(i * 31);
    for (std::uint32_t y = 0; y < dataset.Lines; y += kTile)
        for (std::uint32_t x = 0; x < dataset.Samples; x += kTile) {
            if (dataset.TileOrdering < 2)
                dataset.WriteTileInterleaved<unsigned char>(x, y, kTile, kTile, list.View(), 0,
                                                            pixels.data());
            else
                dataset.WriteTileMorton<unsigned char>(x, y, kTile, kTile, list.View(), 0,
                                                       pixels.data());
        }
}

double Seconds(const std::function<void()>& work) {
    const auto start = std::chrono::steady_clock::now();
    work();
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

double LowerQuartile(std::vector<double> values) {
    if (values.empty()) return 0;
    const auto place = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 4);
    std::nth_element(values.begin(), place, values.end());
    return *place;
}

// Runs both in turns and reports both quartiles and their ratio.
void Compare(benchmark::State& state, const std::function<void()>& ours,
             const std::function<void()>& bound) {
    ours();
    bound();
    std::vector<double> ourTimes;
    std::vector<double> boundTimes;
    for (auto _ : state) {
        boundTimes.push_back(Seconds(bound));
        ourTimes.push_back(Seconds(ours));
        state.SetIterationTime(ourTimes.back());
    }
    const double our = LowerQuartile(ourTimes);
    const double their = LowerQuartile(boundTimes);
    state.counters["ours_ms"] = our * 1e3;
    state.counters["bound_ms"] = their * 1e3;
    state.counters["ratio"] = their / our;
}

class PlainFile {
public:
    PlainFile(const std::string& path, int flags) : descriptor(open(path.c_str(), flags, 0600)) {}
    ~PlainFile() { close(descriptor); }
    void Read(std::uint64_t at, unsigned char* target, std::size_t size) const {
        if (pread(descriptor, target, size, static_cast<off_t>(at)) < 0) std::abort();
    }
    void Write(std::uint64_t at, const unsigned char* source, std::size_t size) const {
        if (pwrite(descriptor, source, size, static_cast<off_t>(at)) < 0) std::abort();
    }
    int descriptor;
};

std::unique_ptr<PyramidDataset> Open(const std::string& name) {
    auto dataset = std::make_unique<PyramidDataset>(zelm::String(PathOf(name).c_str()));
    if (dataset->ReadHeader()) std::abort();
    return dataset;
}

// --- opening ---

// The bound is GDAL's open of a tiled GeoTIFF of that size. With a second argument of 1 that file
// has the same levels, as overviews, and GDAL is asked for them: a pyramid knows them when it is
// open.
void Open16384By12288(benchmark::State& state) {
    const auto ordering = static_cast<std::uint32_t>(state.range(0));
    Create("open.pyr", 16384, 12288, 3, 5, ordering);
    const std::string tiff = PathOf("open.tif");
    GDALDriver* const driver = GetGDALDriverManager()->GetDriverByName("GTiff");
    char* options[] = {const_cast<char*>("TILED=YES"), const_cast<char*>("BLOCKXSIZE=256"),
                       const_cast<char*>("BLOCKYSIZE=256"), const_cast<char*>("SPARSE_OK=TRUE"),
                       nullptr};
    GDALDataset* const made = driver->Create(tiff.c_str(), 16384, 12288, 3, GDT_Byte, options);
    const bool levels = state.range(1) != 0;
    int reductions[] = {2, 4, 8, 16, 32};
    if (levels) made->BuildOverviews("NONE", 5, reductions, 0, nullptr, nullptr, nullptr);
    GDALClose(made);
    Compare(
        state, [] { Open("open.pyr"); },
        [&] {
            GDALDataset* const opened =
                GDALDataset::FromHandle(GDALOpen(tiff.c_str(), GA_ReadOnly));
            if (levels && opened->GetRasterBand(1)->GetOverviewCount() != 5) std::abort();
            GDALClose(opened);
        });
}
BENCHMARK(Open16384By12288)
    ->Args({0, 0})
    ->Args({0, 1})
    ->Args({2, 1})
    ->UseManualTime()
    ->Unit(benchmark::kMicrosecond);

// With statistics and histograms of its bands. The bound is GDAL's open of a GeoTIFF that has the
// same values as metadata, and asks for them: a pyramid has its document parsed when it is open.
void OpenWithStatistics(benchmark::State& state) {
    const auto made = Create("stored.pyr", 2048, 2048, 3, 3, 1);
    zelm::Array<zelm::RasterBandStats<unsigned char>> stats;
    zelm::Array<zelm::RasterBandHistogram<unsigned char>> histograms;
    for (std::uint32_t band = 0; band < 3; ++band) {
        zelm::RasterBandStats<unsigned char> record;
        record.band = band;
        record.flags = zelm::StatsFlag::All;
        stats.Append(record);
        zelm::RasterBandHistogram<unsigned char> bins;
        bins.band = band;
        bins.binCount = 256;
        for (std::uint64_t i = 0; i < 256; ++i) bins.counts.Append(i * 1000);
        histograms.Append(bins);
    }
    if (!made->SetBandStats(stats) || !made->SetHistograms(histograms)) std::abort();
    const std::string tiff = PathOf("stored.tif");
    char* options[] = {const_cast<char*>("TILED=YES"), const_cast<char*>("SPARSE_OK=TRUE"),
                       nullptr};
    GDALDataset* const file = GetGDALDriverManager()->GetDriverByName("GTiff")->Create(
        tiff.c_str(), 2048, 2048, 3, GDT_Byte, options);
    std::string counts;
    for (int i = 0; i < 256; ++i) counts += std::to_string(i * 1000) + '|';
    for (int band = 1; band <= 3; ++band) {
        file->GetRasterBand(band)->SetStatistics(1, 2, 3, 4);
        file->GetRasterBand(band)->SetMetadataItem("HISTOGRAM", counts.c_str());
    }
    GDALClose(file);
    Compare(
        state, [] { Open("stored.pyr"); },
        [&] {
            GDALDataset* const opened =
                GDALDataset::FromHandle(GDALOpen(tiff.c_str(), GA_ReadOnly));
            if (!opened->GetRasterBand(1)->GetMetadataItem("HISTOGRAM")) std::abort();
            GDALClose(opened);
        });
}
BENCHMARK(OpenWithStatistics)->UseManualTime()->Unit(benchmark::kMicrosecond);

void TableOf16384By12288(benchmark::State& state) {
    const auto dataset = Create("table.pyr", 16384, 12288, 3, 5, 2);
    for (auto _ : state) {
        dataset->TileCursor = dataset->TileDataStart;
        dataset->BuildTileTable(16384, 12288, 256, 256, 3, 1);
    }
    state.counters["limit_ms"] = 0.2;
}
BENCHMARK(TableOf16384By12288)->Unit(benchmark::kMicrosecond);

// 65,536 tiles in a row or a column.
void OpenLongGrid(benchmark::State& state) {
    const bool tall = state.range(0) != 0;
    const std::uint32_t extent = 65536 * kTile;
    Create("long.pyr", tall ? 1 : extent, tall ? extent : 1, 1, 8, 2);
    for (auto _ : state) Open("long.pyr");
    state.counters["limit_ms"] = 100;
}
BENCHMARK(OpenLongGrid)->Arg(0)->Arg(1)->Unit(benchmark::kMicrosecond);

// The place of a tile in the largest grid that the curve has, by level.
void PlaceInLargestGrid(benchmark::State& state) {
    const auto level = static_cast<std::uint32_t>(state.range(0));
    const zelm::TilePlaces places({zelm::LevelGeometry(16777216, 16777216, 256, 0), 0, 8, 12, 1},
                                  0);
    std::uint32_t x = 1, y = 1;
    for (auto _ : state) {
        benchmark::DoNotOptimize(places.At(0, level, x >> level, y >> level));
        x = (x * 48271u) & 0xFFFFu;
        y = (y * 16807u) & 0xFFFFu;
    }
}
BENCHMARK(PlaceInLargestGrid)->Arg(0)->Arg(3)->Arg(8);

// --- transfers, on data that lie in the page cache ---

// The bound is one read for each tile, into the same buffer.
void ReadWholeTiles(benchmark::State& state) {
    const auto bands = static_cast<std::uint32_t>(state.range(1));
    auto made =
        Create("tiles.pyr", 2048, 2048, bands, 0, static_cast<std::uint32_t>(state.range(0)));
    Fill(*made);
    made.reset();
    const auto dataset = Open("tiles.pyr");
    const PlainFile plain(PathOf("tiles.pyr"), O_RDONLY);
    List list(bands);
    const std::size_t size = std::size_t{kTile} * kTile * bands;
    Bytes buffer(size);
    Compare(
        state,
        [&] {
            const auto view = list.View();
            for (std::uint32_t y = 0; y < 2048; y += kTile)
                for (std::uint32_t x = 0; x < 2048; x += kTile)
                    dataset->ReadTile<unsigned char>(x, y, kTile, kTile, view, 0, buffer.data());
        },
        [&] {
            for (std::uint64_t tile = 0; tile < 64; ++tile)
                plain.Read(dataset->TileDataStart + tile * size, buffer.data(), size);
        });
}
BENCHMARK(ReadWholeTiles)
    ->Args({0, 3})
    ->Args({1, 3})
    ->Args({2, 1})
    ->Args({2, 12})
    ->UseManualTime()
    ->Unit(benchmark::kMillisecond);

// The bound reads the tiles that the windows touch, run by run.
void ReadWindows(benchmark::State& state) {
    const auto ordering = static_cast<std::uint32_t>(state.range(0));
    const auto bands = static_cast<std::uint32_t>(state.range(1));
    auto made = Create("windows.pyr", 3072, 2048, bands, 0, ordering);
    Fill(*made);
    made.reset();
    const auto dataset = Open("windows.pyr");
    const PlainFile plain(PathOf("windows.pyr"), O_RDONLY);
    List list(bands);
    Bytes buffer(std::size_t{512} * 512 * bands);
    const std::size_t tile = std::size_t{kTile} * kTile * (ordering < 2 ? bands : 1);
    Bytes touched(3 * tile);
    const auto windows = [](const std::function<void(std::uint32_t, std::uint32_t)>& visit) {
        for (std::uint32_t y = 100; y + 512 <= 2048; y += 600)
            for (std::uint32_t x = 100; x + 512 <= 3072; x += 600) visit(x, y);
    };
    Compare(
        state,
        [&] {
            const auto view = list.View();
            windows([&](std::uint32_t x, std::uint32_t y) {
                dataset->ReadTile<unsigned char>(x, y, 512, 512, view, 0, buffer.data());
            });
        },
        [&] {
            windows([&](std::uint32_t x, std::uint32_t y) {
                const std::uint32_t tx = x / kTile;
                const std::uint32_t across = (x + 511) / kTile - tx + 1;
                for (std::uint32_t ty = y / kTile; ty <= (y + 511) / kTile; ++ty) {
                    if (ordering < 2) {
                        plain.Read(dataset->LevelOffsets[0] + dataset->GetTileOffset(tx, ty, 0),
                                   touched.data(), across * tile);
                        continue;
                    }
                    for (std::uint32_t band = 0; band < bands; ++band)
                        for (std::uint32_t i = 0; i < across; ++i)
                            plain.Read(dataset->TileOffsets
                                           .data[(std::size_t{band} * 8 + ty) * 12 + tx + i],
                                       touched.data(), tile);
                }
            });
        });
}
BENCHMARK(ReadWindows)
    ->Args({0, 3})
    ->Args({1, 3})
    ->Args({2, 12})
    ->Args({0, 8})
    ->UseManualTime()
    ->Unit(benchmark::kMillisecond);

// The bound is one write for each tile, at the same offsets of the same file.
void WriteWholeTiles(benchmark::State& state) {
    const auto bands = static_cast<std::uint32_t>(state.range(1));
    const auto dataset =
        Create("write.pyr", 2048, 2048, bands, 0, static_cast<std::uint32_t>(state.range(0)));
    Fill(*dataset);
    const PlainFile plain(PathOf("write.pyr"), O_RDWR);
    List list(bands);
    const std::size_t size = std::size_t{kTile} * kTile * bands;
    Bytes buffer(size, 7);
    Compare(
        state,
        [&] {
            const auto view = list.View();
            for (std::uint32_t y = 0; y < 2048; y += kTile)
                for (std::uint32_t x = 0; x < 2048; x += kTile) {
                    if (dataset->TileOrdering < 2)
                        dataset->WriteTileInterleaved<unsigned char>(x, y, kTile, kTile, view, 0,
                                                                     buffer.data());
                    else
                        dataset->WriteTileMorton<unsigned char>(x, y, kTile, kTile, view, 0,
                                                                buffer.data());
                }
        },
        [&] {
            for (std::uint64_t tile = 0; tile < 64; ++tile)
                plain.Write(dataset->TileDataStart + tile * size, buffer.data(), size);
        });
}
BENCHMARK(WriteWholeTiles)
    ->Args({0, 3})
    ->Args({1, 3})
    ->Args({2, 12})
    ->UseManualTime()
    ->Unit(benchmark::kMillisecond);

// The limit of whole tiles in the ordering Morton: the runs of all planes are read into work space,
// where they would be woven. The bound is that of ReadWholeTiles.
void ReadPlanesUnwoven(benchmark::State& state) {
    constexpr std::uint32_t kBands = 12;
    auto made = Create("planes.pyr", 2048, 2048, kBands, 0, 2);
    Fill(*made);
    made.reset();
    const PlainFile plain(PathOf("planes.pyr"), O_RDONLY);
    const std::uint64_t start = Open("planes.pyr")->TileDataStart;
    constexpr std::size_t kPlane = std::size_t{kTile} * kTile, kTiles = 64;
    constexpr std::size_t kRun = zelm::TileRequest::kPlanesRunBytes / (kTile * kBands) * kTile;
    Bytes buffer(kPlane * kBands);
    Compare(
        state,
        [&] {
            for (std::uint64_t tile = 0; tile < kTiles; ++tile)
                for (std::size_t done = 0; done < kPlane; done += kRun)
                    for (std::uint64_t band = 0; band < kBands; ++band)
                        plain.Read(start + (band * kTiles + tile) * kPlane + done,
                                   buffer.data() + band * kRun, std::min(kRun, kPlane - done));
        },
        [&] {
            for (std::uint64_t tile = 0; tile < kTiles; ++tile)
                plain.Read(start + tile * buffer.size(), buffer.data(), buffer.size());
        });
}
BENCHMARK(ReadPlanesUnwoven)->UseManualTime()->Unit(benchmark::kMillisecond);

// Eight rows of a tile's planes become pixels, from cache to cache.
void WeavePlanes(benchmark::State& state) {
    const auto bands = static_cast<std::uint32_t>(state.range(0));
    constexpr std::uint32_t kRows = 8;
    const std::size_t planeStep = std::size_t{kRows} * kTile + zelm::TileRequest::kPlaneGap;
    const Bytes planes(planeStep * bands, 7);
    Bytes pixels(std::size_t{kRows} * kTile * bands);
    for (auto _ : state) {
        zelm::MoveSamples({planes.data(), kTile, 1, planeStep},
                          {pixels.data(), std::size_t{kTile} * bands, bands, 1}, kRows, kTile,
                          bands, 1);
        benchmark::ClobberMemory();
    }
    state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(pixels.size()));
}
BENCHMARK(WeavePlanes)->Arg(3)->Arg(12)->Arg(16);

// Initialised before GDAL's drivers, which would otherwise take its memory manager down with them.
const bool kReady = [] {
    xercesc::XMLPlatformUtils::Initialize();
    GDALAllRegister();
    return true;
}();

}  // namespace
