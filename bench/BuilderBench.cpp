// Building pyramids of three-byte rasters from a source in memory, beside the bound: copying the
// same bytes and writing them to a file of the same disk, tile by tile, with nothing in between.
//
// The source repeats one strip of 256 lines, so that the memory of the process is the builder's.
#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <random>
#include <string>
#include <vector>

#include "host/build/PyramidBuilder.h"

namespace {

constexpr std::uint32_t kBands = 3;
constexpr std::size_t kTileBytes = std::size_t{256} * 256 * kBands;

class RepeatedStrip : public zmchost::RasterSource {
public:
    RepeatedStrip(std::uint32_t samples, std::uint32_t lines) {
        props.samples = samples;
        props.lines = lines;
        props.bands = kBands;
        props.pixelType = zelm::PixelTypeCode::Byte;
        strip.resize(std::size_t{samples} * kBands * 256);
        std::mt19937 random(7);
        for (std::size_t i = 0; i < strip.size(); ++i)
            strip[i] = static_cast<unsigned char>(i / 97 + random() % 32);
    }
    std::string Name() const override { return "strip"; }
    zelm::RasterProps Props() const override { return props; }
    void Read(const zmchost::Window& window, std::span<const std::uint32_t>, void* out) override {
        auto* to = static_cast<unsigned char*>(out);
        const std::size_t rowBytes = std::size_t{window.width} * kBands;
        const std::size_t stride = std::size_t{props.samples} * kBands;
        for (std::uint32_t line = 0; line < window.height; ++line)
            std::memcpy(to + line * rowBytes,
                        strip.data() + ((window.y + line) % 256) * stride + window.x * kBands,
                        rowBytes);
    }

private:
    zelm::RasterProps props;
    std::vector<unsigned char> strip;
};

std::string ScratchFile(const char* name) {
    const char* const folder = std::getenv("ZMC_BENCH_DIR");
    return (std::filesystem::path(folder ? folder : "/tmp") / name).string();
}

double PeakMegabytes() {
    std::ifstream status("/proc/self/status");
    for (std::string line; std::getline(status, line);)
        if (line.starts_with("VmHWM:")) return std::stod(line.substr(6)) / 1024;
    return 0;
}

void ForgetPeak() { std::ofstream("/proc/self/clear_refs") << "5"; }

void BM_Build(benchmark::State& state) {
    const auto samples = static_cast<std::uint32_t>(state.range(0));
    const auto lines = static_cast<std::uint32_t>(state.range(1));
    const auto module = zmchost::Module::Load(ZMC_MODULE_PATH);
    const zmchost::PyramidBuilder builder(module);
    const std::string file = ScratchFile("builder_bench.zmc");
    RepeatedStrip source(samples, lines);
    zmchost::BuildOptions options;
    options.threads = static_cast<std::uint32_t>(state.range(2));
    options.overwrite = true;
    zmchost::BuildReport report;
    ForgetPeak();
    for (auto _ : state) report = builder.Build(source, file, options);
    state.SetBytesProcessed(state.iterations() * std::int64_t{samples} * lines * kBands);
    state.counters["strips_MB"] = static_cast<double>(report.peakMemory) / 1048576;
    state.counters["peak_MB"] = PeakMegabytes();
    std::filesystem::remove(file);
}

// The bound: the tiles of all levels, copied once and written once, and the file flushed.
void BM_CopyAndWrite(benchmark::State& state) {
    const std::size_t tiles =
        static_cast<std::size_t>(state.range(0)) * static_cast<std::size_t>(state.range(1)) / 65536;
    const std::string name = ScratchFile("builder_bound.tmp");
    std::vector<unsigned char> from(kTileBytes * 64, 7);
    std::vector<unsigned char> tile(kTileBytes);
    for (auto _ : state) {
        const int file = open(name.c_str(), O_RDWR | O_CREAT | O_TRUNC, 0666);
        for (std::size_t i = 0; i < tiles * 4 / 3; ++i) {
            std::memcpy(tile.data(), from.data() + (i % 64) * kTileBytes, kTileBytes);
            if (write(file, tile.data(), kTileBytes) < 0) state.SkipWithError("cannot write");
        }
        fsync(file);
        close(file);
    }
    state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(tiles * kTileBytes));
    std::filesystem::remove(name);
}

}  // namespace

#define ZMC_ROUNDS Unit(benchmark::kMillisecond)->UseRealTime()->MeasureProcessCPUTime()
BENCHMARK(BM_CopyAndWrite)->Args({16384, 12288})->ZMC_ROUNDS;
BENCHMARK(BM_Build)
    ->ArgNames({"width", "height", "threads"})
    ->Args({4096, 3072, 2})
    ->Args({8192, 6144, 2})
    ->Args({16384, 12288, 1})
    ->Args({16384, 12288, 2})
    ->Args({65536, 3072, 2})
    ->ZMC_ROUNDS;
