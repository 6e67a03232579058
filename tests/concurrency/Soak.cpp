// Mixed work of a host in one process for as long as it is told to: building, opening, reading,
// writing, storing, updating, closing, unloading and loading. What is read is held against a model
// of every sample, and what the process holds must not grow.
//
//     soak SECONDS [SEED]
//
// Ends with 0, or with 1 and a line on stderr that tells the seed and what was wrong.
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <optional>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

#include "core/ElementTypes.h"
#include "host/build/PyramidUpdate.h"
#include "host/raster/Raster.h"
#include "tests/support/Holdings.h"
#include "tests/support/MemorySource.h"
#include "tests/support/Sanitizers.h"
#include "tests/support/ScratchDirectory.h"

namespace zmctest {
namespace {

using zmchost::Access;
using zmchost::ModulePtr;
using zmchost::Raster;
using zmchost::Window;

constexpr double kMiB = 1 << 20;

// Random numbers of one run, the same for the same seed.
class Dice {
public:
    explicit Dice(unsigned seed) : random(seed) {}
    std::uint32_t UpTo(std::uint32_t most) {
        return std::uniform_int_distribution<std::uint32_t>(0, most)(random);
    }
    bool Once(std::uint32_t in) { return UpTo(in - 1) == 0; }
    Window WindowIn(std::uint32_t width, std::uint32_t height, std::uint32_t most) {
        const std::uint32_t x = UpTo(width - 1), y = UpTo(height - 1);
        return {x, y, 1 + UpTo(std::min(width - x, most) - 1),
                1 + UpTo(std::min(height - y, most) - 1)};
    }

private:
    std::mt19937 random;
};

// One pyramid and the samples that level 0 of it has.
template <class T>
class Subject {
public:
    Subject(std::string name, Dice& numbers) : file(std::move(name)), dice(numbers) {}

    void Build(const ModulePtr& module) {
        const bool many = dice.Once(6);
        model.emplace(1 + dice.UpTo(699), 1 + dice.UpTo(599), many ? 9 : 1 + dice.UpTo(3));
        model->FillWithNoise(dice.UpTo(1u << 30));
        options = {};
        options.overwrite = true;
        options.threads = 1 + dice.UpTo(1);
        options.memory = std::uint64_t{64} << 20;
        options.statistics = dice.Once(2);
        if (!many && dice.Once(2)) options.ordering = zmchost::Ordering::Blocked;
        zmchost::PyramidBuilder(module).Build(*model, file, options);
        if (dice.Once(2)) Update(module).KeepRecords("");
        stores = 0;
    }

    void Read(const ModulePtr& module) {
        Raster raster = Raster::Open(module, file, dice.Once(2) ? Access::Read : Access::Update);
        const Window window = dice.WindowIn(raster.Width(), raster.Height(), 300);
        Expect(raster.Read<T>(0, window) == Samples(window), "samples are not those written");
        const std::uint32_t level = dice.UpTo(raster.MaxLevel());
        raster.Read<T>(level, dice.WindowIn(raster.Width(level), raster.Height(level), 300));
        raster.Records<T>();
    }

    void Write(const ModulePtr& module) {
        Raster raster = Raster::Open(module, file);
        const Window window = dice.WindowIn(raster.Width(), raster.Height(), 300);
        Change(window);
        raster.Write<T>(0, window, Samples(window));
        Expect(raster.Read<T>(0, window) == Samples(window), "what was written does not read back");
    }

    void Store(const ModulePtr& module) {
        // A document keeps all that was ever stored, and grows.
        if (++stores > 20) return Build(module);
        Raster raster = Raster::Open(module, file);
        raster.KeepCopies(dice.Once(2));
        if (!raster.HasStatistics(0)) StoreStatistics(raster);
        if (!raster.HasPalette(0)) StorePalette(raster);
        zelm::RasterBandHistogram<T> histogram;
        histogram.binCount = 1 + dice.UpTo(40);
        for (std::uint32_t bin = 0; bin < histogram.binCount; ++bin)
            histogram.counts.Append(std::uint64_t{dice.UpTo(1000)});
        const std::size_t before = raster.Histograms<T>().size();
        raster.SetHistograms<T>({histogram});
        Expect(raster.Histograms<T>().size() == before + 1, "a histogram was not stored");
    }

    void UpdateWindow(const ModulePtr& module) {
        const Window window = dice.WindowIn(model->props.samples, model->props.lines, 200);
        Change(window);
        Update(module).Run({window}, {false, dice.Once(2), ""});
        stores = 0;
        Read(module);
    }

    void ReadMemory(const ModulePtr& module) {
        zelm::RasterProps props = model->props;
        props.interleave = zelm::Interleave::BIP;
        Raster raster = Raster::OfMemory(module, model->pixels.data(), props);
        const Window window = dice.WindowIn(props.samples, props.lines, 300);
        Expect(raster.Read<T>(0, window) == Samples(window), "memory reads as something else");
    }

    // Open rasters go on across other work, as long as their module lives.
    void Hold(const ModulePtr& module) {
        held.emplace(Raster::Open(module, file, Access::Read));
        held->Read<T>(held->MaxLevel(), held->Tile(held->MaxLevel(), 0, 0));
    }
    void LetGo() { held.reset(); }

    std::ptrdiff_t ModelBytes() const {
        return static_cast<std::ptrdiff_t>(model->pixels.capacity() * sizeof(T));
    }

private:
    zmchost::PyramidUpdate Update(const ModulePtr& module) {
        return {module, *model, file, options};
    }
    void StoreStatistics(Raster& raster) {
        std::vector<zelm::RasterBandStats<T>> records(raster.Bands());
        for (std::uint32_t band = 0; band < raster.Bands(); ++band) {
            records[band].band = band;
            records[band].flags = zelm::StatsFlag::Mean;
            records[band].mean = dice.UpTo(1000);
        }
        raster.SetStatistics<T>(records);
        Expect(raster.HasStatistics(0), "statistics were not stored");
    }
    void StorePalette(Raster& raster) {
        zelm::Palette palette;
        for (std::uint32_t i = 0; i <= dice.UpTo(50); ++i) palette.AddColor(zelm::Color());
        raster.SetBandPalette(0, palette);
        Expect(raster.HasPalette(0), "a palette was not stored");
    }
    static void Expect(bool holds, const char* complaint) {
        if (!holds) throw std::runtime_error(complaint);
    }
    void Change(const Window& window) {
        MemorySource<T> noise = *model;
        noise.FillWithNoise(dice.UpTo(1u << 30));
        Copy(window, noise, *model);
    }
    static void Copy(const Window& window, const MemorySource<T>& from, MemorySource<T>& to) {
        const std::size_t bands = from.props.bands;
        for (std::uint64_t y = window.y; y < window.Bottom(); ++y) {
            const auto at =
                static_cast<std::ptrdiff_t>((y * from.props.samples + window.x) * bands);
            std::copy_n(from.pixels.begin() + at, window.width * bands, to.pixels.begin() + at);
        }
    }
    std::vector<T> Samples(const Window& window) {
        std::vector<T> samples(std::size_t{window.width} * window.height * model->props.bands);
        std::vector<std::uint32_t> bands(model->props.bands);
        for (std::uint32_t band = 0; band < bands.size(); ++band) bands[band] = band;
        model->Read(window, bands, samples.data());
        return samples;
    }

    const std::string file;
    Dice& dice;
    std::optional<MemorySource<T>> model;
    zmchost::BuildOptions options;
    std::uint32_t stores = 0;
    std::optional<Raster> held;
};

// What the process may hold more than when it had settled. The address sanitizer keeps a record of
// every global that was ever loaded, and frees late.
struct Bounds {
    static std::ptrdiff_t Resident(std::size_t loads) {
        const auto each = static_cast<std::ptrdiff_t>(loads);
        return IsSanitized() ? (192 << 20) + each * (1280 << 10) : 64 << 20;
    }
    static std::ptrdiff_t Heap(std::size_t loads) {
        return (2 << 20) + (IsSanitized() ? static_cast<std::ptrdiff_t>(loads) * 1024 : 0);
    }
};

class Soak {
public:
    Soak(double wanted, unsigned ownSeed) : seconds(wanted), seed(ownSeed), dice(ownSeed) {}

    void Run() {
        Load();
        bytes.Build(module);
        words.Build(module);
        reals.Build(module);
        // Settled is what has done all there is to do some times.
        const double settling = std::min(seconds / 3, 60.0);
        while (Elapsed() < settling || rounds < 200) Round();
        const Holdings before = Rest();
        const std::size_t loadsBefore = loads;
        Holdings now = before;
        do {
            const double next = Elapsed() + std::min(10.0, seconds / 10);
            while (Elapsed() < next) Round();
            now = Rest();
            Judge(before, now, loads - loadsBefore);
        } while (Elapsed() < seconds);
        std::printf(
            "soak: %.0f s, seed %u: %zu rounds, %zu of them loads; resident %.1f to %.1f MiB, heap "
            "%.2f to %.2f MiB, descriptors %td to %td\n",
            Elapsed(), seed, rounds, loads, static_cast<double>(before.resident) / kMiB,
            static_cast<double>(now.resident) / kMiB, static_cast<double>(before.heap) / kMiB,
            static_cast<double>(now.heap) / kMiB, before.descriptors, now.descriptors);
    }

    unsigned Seed() const { return seed; }
    std::size_t Rounds() const { return rounds; }

private:
    double Elapsed() const {
        return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    }
    void Load() { module = zmchost::Module::Load(ZMC_MODULE_PATH); }
    void Unload() {
        bytes.LetGo();
        words.LetGo();
        reals.LetGo();
        module.reset();
        if (ReadText("/proc/self/maps").find("libzmcraster.so") != std::string::npos)
            throw std::runtime_error("the module stays mapped");
    }

    template <class T>
    void Work(Subject<T>& subject) {
        switch (dice.UpTo(9)) {
            case 0:
                return subject.Build(module);
            case 1:
            case 2:
                return subject.Write(module);
            case 3:
                return subject.Store(module);
            case 4:
                return subject.UpdateWindow(module);
            case 5:
                return subject.ReadMemory(module);
            case 6:
                return dice.Once(2) ? subject.Hold(module) : subject.LetGo();
            default:
                return subject.Read(module);
        }
    }

    void Round() {
        ++rounds;
        if (dice.Once(50)) {
            ++loads;
            Unload();
            Load();
        }
        switch (dice.UpTo(2)) {
            case 0:
                return Work(bytes);
            case 1:
                return Work(words);
            default:
                return Work(reals);
        }
    }

    // What is held with nothing open, but for the models, which are larger and smaller.
    Holdings Rest() {
        Unload();
        ++loads;
        malloc_trim(0);
        Holdings held = HeldNow();
        held.heap -= bytes.ModelBytes() + words.ModelBytes() + reals.ModelBytes();
        Load();
        return held;
    }

    static void Judge(const Holdings& before, const Holdings& now, std::size_t loads) {
        const auto grown = [](const char* what, std::ptrdiff_t from, std::ptrdiff_t to) {
            throw std::runtime_error(std::string(what) + " grow from " + std::to_string(from) +
                                     " to " + std::to_string(to));
        };
        if (now.descriptors != before.descriptors)
            grown("descriptors", before.descriptors, now.descriptors);
        if (now.resident > before.resident + Bounds::Resident(loads))
            grown("resident bytes", before.resident, now.resident);
        if (now.heap > before.heap + Bounds::Heap(loads))
            grown("bytes on the heap", before.heap, now.heap);
    }

    const std::chrono::steady_clock::time_point start = std::chrono::steady_clock::now();
    const double seconds;
    const unsigned seed;
    Dice dice;
    const ScratchDirectory folder{MemoryFolder()};
    ModulePtr module;
    Subject<unsigned char> bytes{folder / "bytes.pyr", dice};
    Subject<unsigned short> words{folder / "words.pyr", dice};
    Subject<float> reals{folder / "reals.pyr", dice};
    std::size_t rounds = 0, loads = 0;
};

}  // namespace
}  // namespace zmctest

int main(int count, char** arguments) {
    const double seconds = count > 1 ? std::strtod(arguments[1], nullptr) : 0;
    if (!(seconds > 0)) {
        std::fprintf(stderr, "usage: soak SECONDS [SEED]\n");
        return 2;
    }
    const unsigned long seed = count > 2 ? std::strtoul(arguments[2], nullptr, 10) : 1;
    zmctest::Soak soak(seconds, static_cast<unsigned>(seed));
    try {
        soak.Run();
    } catch (const std::exception& error) {
        std::fprintf(stderr, "soak: seed %u, round %zu: %s\n", soak.Seed(), soak.Rounds(),
                     error.what());
        return 1;
    }
    return 0;
}
