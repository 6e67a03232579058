// Pyramids beside GDAL's own GeoTIFF, read through GDAL: the same pixels, uncompressed, tiles of
// 256, pixel-interleaved, with levels of the same sizes. Prints the ratio of the times, GeoTIFF to
// pyramid; runs of the two alternate, and the median of each counts. The rasters are made in a
// folder that is the first argument, or else a temporary one. Then the pyramid with itself: readers
// of its own on two threads, and one whose windows two threads of the driver read.
#include <gdal_priv.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <functional>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "gdal/Driver.h"

namespace {

constexpr int kWidth = 8192;
constexpr int kHeight = 6144;
constexpr int kBands = 3;
constexpr int kRuns = 9;

using DatasetPtr = std::unique_ptr<GDALDataset>;

DatasetPtr Open(const std::string& name) {
    DatasetPtr dataset(GDALDataset::Open(name.c_str(), GDAL_OF_RASTER));
    if (!dataset) std::exit(1);
    return dataset;
}

void Check(CPLErr result) {
    if (result != CE_None) std::exit(1);
}

void MakeTiff(const std::string& name) {
    const char* const options[] = {"TILED=YES", "INTERLEAVE=PIXEL", "PHOTOMETRIC=RGB", nullptr};
    GDALDriver& driver = *GetGDALDriverManager()->GetDriverByName("GTiff");
    const DatasetPtr dataset(driver.Create(name.c_str(), kWidth, kHeight, kBands, GDT_Byte,
                                           const_cast<char**>(options)));
    std::mt19937 random(1);
    std::vector<unsigned char> lines(std::size_t{kWidth} * 256 * kBands);
    for (int y = 0; y < kHeight; y += 256) {
        std::generate(lines.begin(), lines.end(),
                      [&] { return static_cast<unsigned char>(random() >> 24); });
        Check(dataset->RasterIO(GF_Write, 0, y, kWidth, 256, lines.data(), kWidth, 256, GDT_Byte,
                                kBands, nullptr, kBands, GSpacing{kWidth} * kBands, 1));
    }
    const int factors[] = {2, 4, 8, 16, 32};
    Check(dataset->BuildOverviews("AVERAGE", 5, factors, 0, nullptr, nullptr, nullptr));
}

void MakePyramid(const std::string& name, const std::string& source) {
    GDALDriver& driver = *GetGDALDriverManager()->GetDriverByName("ZMCPyramid");
    const DatasetPtr tiff = Open(source);
    const DatasetPtr made(
        driver.CreateCopy(name.c_str(), tiff.get(), FALSE, nullptr, nullptr, nullptr));
    if (!made) std::exit(1);
}

void RandomWindows(const std::string& name, unsigned seed = 2) {
    const DatasetPtr dataset = Open(name);
    std::vector<unsigned char> buffer(std::size_t{512} * 512 * kBands);
    std::mt19937 random(seed);
    for (int i = 0; i < 300; ++i) {
        const int x = static_cast<int>(random() % (kWidth - 512));
        const int y = static_cast<int>(random() % (kHeight - 512));
        Check(dataset->RasterIO(GF_Read, x, y, 512, 512, buffer.data(), 512, 512, GDT_Byte, kBands,
                                nullptr, 0, 0, 0));
    }
}

void ReadBlock(GDALRasterBand& band, int x, int y, std::vector<unsigned char>& buffer) {
    Check(band.RasterIO(GF_Read, x, y, 256, 256, buffer.data(), 256, 256, GDT_Byte, 0, 0));
}

void BlocksByBand(const std::string& name) {
    const DatasetPtr dataset = Open(name);
    std::vector<unsigned char> buffer(std::size_t{256} * 256);
    for (int y = 0; y < kHeight; y += 256)
        for (int x = 0; x < kWidth; x += 256)
            for (int band = 1; band <= kBands; ++band)
                ReadBlock(*dataset->GetRasterBand(band), x, y, buffer);
}

void BandAfterBand(const std::string& name) {
    const DatasetPtr dataset = Open(name);
    std::vector<unsigned char> buffer(std::size_t{256} * 256);
    for (int band = 1; band <= kBands; ++band)
        for (int y = 0; y < kHeight; y += 256)
            for (int x = 0; x < kWidth; x += 256)
                ReadBlock(*dataset->GetRasterBand(band), x, y, buffer);
}

void Downsampled(const std::string& name) {
    for (const int factor : {2, 4, 8, 16}) {
        const int width = kWidth / factor, height = kHeight / factor;
        std::vector<unsigned char> buffer(static_cast<std::size_t>(width) *
                                          static_cast<std::size_t>(height) * kBands);
        Check(Open(name)->RasterIO(GF_Read, 0, 0, kWidth, kHeight, buffer.data(), width, height,
                                   GDT_Byte, kBands, nullptr, 0, 0, 0));
    }
}

void OpenAndClose(const std::string& name) {
    for (int i = 0; i < 500; ++i) Open(name);
}

double Seconds(const std::function<void()>& work) {
    const auto start = std::chrono::steady_clock::now();
    work();
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

double Median(std::vector<double> values) {
    std::sort(values.begin(), values.end());
    return values[values.size() / 2];
}

// Medians of two kinds of work that take turns; the first turn only warms up.
std::pair<double, double> Compare(const std::function<void()>& one,
                                  const std::function<void()>& other) {
    std::vector<double> first, second;
    for (int run = 0; run <= kRuns; ++run) {
        const double a = Seconds(one), b = Seconds(other);
        if (run == 0) continue;
        first.push_back(a);
        second.push_back(b);
    }
    return {Median(first), Median(second)};
}

void Report(const char* what, std::pair<double, double> times, const char* goal) {
    std::printf("%-44s %9.2f ms %9.2f ms   %5.2f   %s\n", what, times.first * 1e3,
                times.second * 1e3, times.first / times.second, goal);
}

void InTwoThreads(const std::string& name) {
    std::thread other([&] { RandomWindows(name, 3); });
    RandomWindows(name, 2);
    other.join();
}

// Windows of 64 tiles and more, by so many threads of the driver's own.
class LargeWindows {
public:
    LargeWindows(const std::string& name, int side, const char* threads)
        : size(side), buffer(std::size_t(side) * std::size_t(side) * kBands) {
        CPLStringList options;
        options.SetNameValue("NUM_THREADS", threads);
        dataset.reset(
            GDALDataset::Open(name.c_str(), GDAL_OF_RASTER, nullptr, options.List(), nullptr));
        if (!dataset) std::exit(1);
    }
    void Read() {
        for (int i = 0; i < 8; ++i)
            Check(dataset->RasterIO(GF_Read, i * 256 % (kWidth - size), i * 128, size, size,
                                    buffer.data(), size, size, GDT_Byte, kBands, nullptr, kBands,
                                    GSpacing{kBands} * size, 1));
    }

private:
    const int size;
    std::vector<unsigned char> buffer;
    DatasetPtr dataset;
};

void InTurn(const std::string& name) {
    RandomWindows(name, 3);
    RandomWindows(name, 2);
}

}  // namespace

int main(int argc, char** argv) {
    namespace fs = std::filesystem;
    GDALRegister_ZMCPyramid();
    GDALAllRegister();
    const fs::path folder =
        argc > 1 ? fs::path(argv[1]) : fs::temp_directory_path() / "zmcgdalbench";
    fs::create_directories(folder);
    const std::string tiff = folder / "bench.tif", pyramid = folder / "bench.pyr";
    MakeTiff(tiff);
    MakePyramid(pyramid, tiff);
    GDALSetCacheMax64(GIntBig{64} << 20);
    std::printf("%-44s %12s %12s   ratio   goal\n", "", "GeoTIFF", "pyramid");
    const auto measure = [&](const char* what, void (*work)(const std::string&), const char* goal) {
        Report(what, Compare([&] { work(tiff); }, [&] { work(pyramid); }), goal);
    };
    measure(
        "300 windows of 512, all bands", [](auto& name) { RandomWindows(name); }, "1.3");
    measure("all blocks of 256, each band by band", BlocksByBand, "1.5");
    measure("all blocks of 256, one band after another", BandAfterBand, "");
    measure("whole image at levels 1 to 4", Downsampled, "1.0");
    measure("open and close, 500 times", OpenAndClose, "1.0");
    std::printf("%-44s %12s %12s\n", "", "in turn", "two threads");
    for (const std::string& name : {tiff, pyramid})
        Report(name == tiff ? "600 windows of the GeoTIFF" : "600 windows of the pyramid",
               Compare([&] { InTurn(name); }, [&] { InTwoThreads(name); }),
               name == tiff ? "" : "1.7");
    std::printf("%-44s %12s %12s\n", "", "NUM_THREADS=1", "2");
    for (const int side : {2048, 4096}) {
        LargeWindows one(pyramid, side, "1"), two(pyramid, side, "2");
        const std::string what =
            "8 windows of " + std::to_string(side / 256 * side / 256) + " tiles";
        Report(what.c_str(), Compare([&] { one.Read(); }, [&] { two.Read(); }), "1.6");
    }
    fs::remove(tiff);
    fs::remove(pyramid);
    return 0;
}
