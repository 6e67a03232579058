// What a palette of 65,536 colours costs, wherever one is read or stored: through the host's
// rasters, through GDAL, and on the command line, each from an open to its end. `Scan`, the bare
// parse of the document by handlers that do nothing, is what none of those that read can go below.
// A store behind another palette makes the tree of the old document; all others make none that
// counts.
//
// The commands are timed by the processor time that they take in user mode, and stand beside the
// same command on a file without a palette, which is what starting the program costs.
#include <benchmark/benchmark.h>
#include <gdal_priv.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "format/DocumentParse.h"
#include "gdal/Driver.h"
#include "host/file/MetadataDocument.h"
#include "host/file/PyramidFileInfo.h"
#include "host/raster/Raster.h"
#include "tests/support/ScratchDirectory.h"

namespace {

namespace fs = std::filesystem;

constexpr std::uint32_t kColors = 65536;
constexpr std::uint32_t kSide = 256;

zelm::Palette& Colors() {
    static zelm::Palette palette;
    for (std::uint32_t i = palette.nextIndex; i < kColors; ++i) {
        unsigned char channels[] = {static_cast<unsigned char>(7 * i),
                                    static_cast<unsigned char>(i >> 8),
                                    static_cast<unsigned char>(13 * i), 255};
        palette.AddColor(zelm::RGBAColor(zelm::Array(channels, zelm::ArrayShape(4))));
    }
    return palette;
}

GDALColorTable& Table() {
    static GDALColorTable table;
    if (table.GetColorEntryCount() == 0) {
        const GDALColorEntry last{};
        table.SetColorEntry(kColors - 1, &last);
        for (const auto& [index, color] : Colors().colors) {
            const GDALColorEntry entry{color->red, color->green, color->blue, color->alpha};
            table.SetColorEntry(static_cast<int>(index), &entry);
        }
    }
    return table;
}

// Two files of the same pixels, one with the palette, and a third to store into, in a folder that
// goes with the program.
struct Files {
    Files() {
        module = zmchost::Module::Load();
        GDALRegister_ZMCPyramid();
        GDALAllRegister();
        zelm::RasterProps props;
        props.samples = props.lines = kSide;
        props.bands = 1;
        props.pixelType = zelm::ElementTraits<std::uint16_t>::code;
        zmchost::Raster raster = zmchost::Raster::Create(module, plain, props, 0);
        raster.Write(0, {0, 0, kSide, kSide},
                     std::vector<std::uint16_t>(std::size_t{kSide} * kSide));
        fs::copy_file(plain, colored);
        zmchost::Raster::Open(module, colored).SetBandPalette(0, Colors());
    }

    const std::string& FreshTarget(const std::string& model) const {
        fs::copy_file(model, target, fs::copy_options::overwrite_existing);
        return target;
    }

    const zmctest::ScratchDirectory folder;
    const std::string plain = folder / "plain.pyr";
    const std::string colored = folder / "colored.pyr";
    const std::string target = folder / "target.pyr";
    zmchost::ModulePtr module;
};

const Files& World() {
    static const Files files;
    return files;
}

void Demand(bool good) {
    if (!good) std::abort();
}

std::unique_ptr<GDALDataset> OpenByGdal(const std::string& file, unsigned flags) {
    std::unique_ptr<GDALDataset> dataset(GDALDataset::Open(file.c_str(), GDAL_OF_RASTER | flags));
    Demand(dataset != nullptr);
    return dataset;
}

void Scan(benchmark::State& state) {
    const std::string text = zmchost::ReadMetadataText(
        World().colored, zmchost::ReadPyramidFileInfo(World().colored).header);
    for (auto _ : state) {
        std::string copy = text, fault;
        xercesc::HandlerBase nobody;
        Demand(zelm::ParseDocumentBytes(reinterpret_cast<unsigned char*>(copy.data()), copy.size(),
                                        nobody, fault)
                   .empty());
    }
}

void HostOpen(benchmark::State& state) {
    for (auto _ : state)
        benchmark::DoNotOptimize(zmchost::Raster::Open(World().module, World().colored));
}

void HostOpenAndPalette(benchmark::State& state) {
    for (auto _ : state) {
        const auto raster = zmchost::Raster::Open(World().module, World().colored);
        Demand(raster.BandPalette(0)->nextIndex == kColors);
    }
}

// What the module's own reader answers, in each call.
void ModulePalette(benchmark::State& state) {
    const auto raster = zmchost::Raster::Open(World().module, World().colored);
    for (auto _ : state)
        raster.Visit([](auto& reader) { Demand(reader.GetPalette(0)->nextIndex == kColors); });
}

void HostStore(benchmark::State& state, const std::string Files::*before, bool keepsCopy) {
    for (auto _ : state) {
        state.PauseTiming();
        const std::string& target = World().FreshTarget(World().*before);
        state.ResumeTiming();
        auto raster = zmchost::Raster::Open(World().module, target);
        raster.KeepCopies(keepsCopy);
        raster.SetBandPalette(0, Colors());
    }
}

void GdalOpenAndColorTable(benchmark::State& state) {
    for (auto _ : state) {
        const auto dataset = OpenByGdal(World().colored, 0);
        Demand(dataset->GetRasterBand(1)->GetColorTable()->GetColorEntryCount() == int{kColors});
    }
}

void GdalStore(benchmark::State& state) {
    for (auto _ : state) {
        state.PauseTiming();
        const std::string& target = World().FreshTarget(World().plain);
        GDALColorTable& table = Table();
        state.ResumeTiming();
        const auto dataset = OpenByGdal(target, GDAL_OF_UPDATE);
        Demand(dataset->GetRasterBand(1)->SetColorTable(&table) == CE_None);
    }
}

// Seconds in user mode.
double RunProgram(std::vector<std::string> words) {
    const pid_t child = fork();
    Demand(child >= 0);
    if (child == 0) {
        std::vector<char*> pointers;
        for (std::string& word : words) pointers.push_back(word.data());
        pointers.push_back(nullptr);
        if (!std::freopen("/dev/null", "w", stdout)) _exit(1);
        execv(pointers[0], pointers.data());
        _exit(1);
    }
    int status = 0;
    rusage usage{};
    Demand(wait4(child, &status, 0, &usage) == child && WIFEXITED(status) &&
           WEXITSTATUS(status) == 0);
    return static_cast<double>(usage.ru_utime.tv_sec) +
           static_cast<double>(usage.ru_utime.tv_usec) * 1e-6;
}

template <class... Words>
void Program(benchmark::State& state, bool withPalette, const char* command, Words... options) {
    const std::string& file = withPalette ? World().colored : World().plain;
    for (auto _ : state)
        state.SetIterationTime(RunProgram({ZMC_PROGRAM_PATH, command, file, options...}));
}

// Both files hold the same pixels.
void Compare(benchmark::State& state, bool withPalette) {
    Program(state, withPalette, "compare", World().plain);
}

constexpr auto kUnit = benchmark::kMillisecond;

BENCHMARK(Scan)->Unit(kUnit);
BENCHMARK(HostOpen)->Unit(kUnit);
BENCHMARK(HostOpenAndPalette)->Unit(kUnit);
BENCHMARK(ModulePalette)->Unit(kUnit);
BENCHMARK_CAPTURE(HostStore, plainly, &Files::plain, false)->Unit(kUnit);
BENCHMARK_CAPTURE(HostStore, with_copy, &Files::plain, true)->Unit(kUnit);
BENCHMARK_CAPTURE(HostStore, behind_another, &Files::colored, false)->Unit(kUnit);
BENCHMARK(GdalOpenAndColorTable)->Unit(kUnit);
BENCHMARK(GdalStore)->Unit(kUnit);
BENCHMARK_CAPTURE(Program, info, true, "info")->Unit(kUnit)->UseManualTime();
BENCHMARK_CAPTURE(Program, info_without, false, "info")->Unit(kUnit)->UseManualTime();
BENCHMARK_CAPTURE(Program, info_json, true, "info", "--json")->Unit(kUnit)->UseManualTime();
BENCHMARK_CAPTURE(Program, verify, true, "verify")->Unit(kUnit)->UseManualTime();
BENCHMARK_CAPTURE(Program, verify_without, false, "verify")->Unit(kUnit)->UseManualTime();
BENCHMARK_CAPTURE(Compare, with, true)->Unit(kUnit)->UseManualTime();
BENCHMARK_CAPTURE(Compare, without, false)->Unit(kUnit)->UseManualTime();

}  // namespace
