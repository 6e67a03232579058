// A hostile file in the hands of a host that uses the host library: read, asked for its records,
// stored to, written to, reduced, and taken as the source of a build.
#include <algorithm>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "fuzz/support/Expect.h"
#include "fuzz/support/Host.h"
#include "fuzz/support/HostileFile.h"
#include "fuzz/support/ScratchFolder.h"
#include "host/build/LevelReduction.h"
#include "host/build/PyramidBuilder.h"
#include "host/file/StoredRecords.h"
#include "host/raster/Raster.h"
#include "platform/FileSystem.h"

namespace {

using zmcfuzz::InputBytes;
using zmchost::Raster;
using zmchost::Window;

constexpr std::uint32_t kMostSide = 300;
constexpr std::uint64_t kMostBuilt = 1u << 17;  // samples

// A pyramid's finest level as the source of a build.
class FromRaster final : public zmchost::RasterSource {
public:
    explicit FromRaster(Raster& source) : raster(source) {}
    std::string Name() const override { return raster.Name(); }
    zelm::RasterProps Props() const override { return raster.Props(); }
    zelm::PalettePtr BandPalette(std::uint32_t band) const override {
        return raster.BandPalette(band);
    }
    void Read(const Window& window, std::span<const std::uint32_t> bands, void* pixels) override {
        raster.Read(0, window, bands, pixels);
    }

private:
    Raster& raster;
};

class Session {
public:
    Session(Raster& opened, InputBytes& steps) : raster(opened), script(steps) {}

    void Run() {
        for (int step = 0; step < 8 && !script.AtEnd(); ++step) {
            try {
                Step();
            } catch (const zmchost::Error& error) {
                ZMC_EXPECT(!error.Reason().empty());
            }
        }
    }

private:
    Raster& raster;
    InputBytes& script;

    std::uint32_t TakeLevel() {
        const std::uint32_t span = std::min(raster.MaxLevel() - raster.MinLevel(), 40u);
        return raster.MinLevel() + script.UpTo(span);
    }
    Window TakeWindow(std::uint32_t level) {
        const auto some = [&](std::uint32_t whole, std::uint32_t& start) {
            start = whole == 0 || script.Flag() ? 0 : script.Size() % whole;
            return script.UpTo(15) == 0
                       ? script.UpTo(kMostSide)
                       : std::min({whole - start, kMostSide, 1 + script.UpTo(255)});
        };
        Window window{};
        window.width = some(raster.Width(level), window.x);
        window.height = some(raster.Height(level), window.y);
        return window;
    }
    std::vector<std::uint32_t> TakeBands() {
        if (raster.Bands() <= 6 && script.Flag()) return raster.AllBands();
        std::vector<std::uint32_t> bands;
        for (std::uint32_t count = script.UpTo(4); count-- != 0;)
            bands.push_back(script.UpTo(raster.Bands()));
        return bands;
    }
    static std::size_t Samples(const Window& window, const std::vector<std::uint32_t>& bands) {
        return std::size_t{window.width} * window.height * bands.size();
    }

    void Step() {
        switch (script.UpTo(9)) {
            case 0:
            case 1:
            case 2:
                return Read();
            case 3:
            case 4:
                return Write();
            case 5:
                return AskForRecords();
            case 6:
                return Store();
            case 7:
                return Reduce();
            case 8:
                return Build();
            default:
                return Describe();
        }
    }

    void Read() {
        const std::uint32_t level = TakeLevel();
        const Window window = TakeWindow(level);
        const auto bands = TakeBands();
        std::vector<unsigned char> pixels(Samples(window, bands) * raster.SampleSize());
        std::vector<unsigned char> mask(Samples(window, bands));
        raster.Read(level, window, bands, pixels.data(), script.Flag() ? mask.data() : nullptr);
        for (const unsigned char byte : mask) ZMC_EXPECT(byte < 2);
    }

    // What was written is what is read.
    void Write() {
        const std::uint32_t level = TakeLevel();
        const Window window = TakeWindow(level);
        const auto bands = TakeBands();
        std::vector<unsigned char> pixels(Samples(window, bands) * raster.SampleSize(),
                                          script.Byte());
        const bool whole = raster.IsComplete();
        raster.Write(level, window, bands, pixels.data());
        std::vector<unsigned char> read(pixels.size());
        if (!whole) return;
        raster.Read(level, window, bands, read.data());
        ZMC_EXPECT(read == pixels);
    }

    void AskForRecords() {
        zelm::VisitElementType(raster.PixelType(), [&]<class T>(std::type_identity<T>) {
            for (std::uint32_t band = 0; band < std::min(raster.Bands(), 20u); ++band) {
                if (raster.HasStatistics(band)) ZMC_EXPECT(raster.Statistics<T>(band).band == band);
                const bool has = raster.HasPalette(band);
                ZMC_EXPECT(has == (raster.BandPalette(band).Get() != nullptr));
            }
            static_cast<void>(raster.Histograms<T>());
        });
        static_cast<void>(raster.DocumentFault());
    }

    void Store() {
        zelm::VisitElementType(raster.PixelType(), [&]<class T>(std::type_identity<T>) {
            const auto before = raster.Histograms<T>().size();
            std::vector<zelm::RasterBandStats<T>> records(raster.Bands());
            for (std::uint32_t band = 0; band < records.size(); ++band) {
                records[band].band = band;
                records[band].flags = zelm::StatsFlag::Mean;
                records[band].mean = script.Byte();
            }
            if (script.Flag()) {
                raster.SetStatistics(records);
                for (std::uint32_t band = 0; band < std::min(raster.Bands(), 20u); ++band)
                    ZMC_EXPECT(raster.Statistics<T>(band).mean == records[band].mean);
            }
            std::vector<zelm::RasterBandHistogram<T>> histograms(script.UpTo(3));
            raster.SetHistograms(histograms);
            ZMC_EXPECT(raster.Histograms<T>().size() == before + histograms.size());
        });
        zelm::Palette palette;
        palette.AddColor(zelm::RGBAColor{zelm::Array<unsigned char>()});
        const std::uint32_t band = script.UpTo(raster.Bands());
        raster.SetBandPalette(band, palette);
        ZMC_EXPECT(raster.HasPalette(band));
    }

    void Reduce() {
        const std::uint32_t level = TakeLevel();
        if (level == raster.MinLevel()) return;
        const Window window = TakeWindow(level);
        if (window.width == 0 || window.height == 0) return;
        static constexpr zmchost::Resampling kMethods[] = {
            zmchost::Resampling::Nearest, zmchost::Resampling::Average, zmchost::Resampling::Cubic,
            zmchost::Resampling::Mode};
        const zmchost::Resampling method = script.OneOf(kMethods);
        if (!zmchost::SupportsElementType(method, raster.PixelType())) return;
        const Window whole{0, 0, raster.Width(level), raster.Height(level)};
        if (!whole.Contains(window)) return;
        zelm::VisitElementType(raster.PixelType(), [&]<class T>(std::type_identity<T>) {
            zmchost::LevelReduction<T> reduction(raster, method);
            reduction.Load(level, window);
            for (std::uint32_t row = 0; row < window.height; ++row)
                static_cast<void>(reduction.Row(row));
        });
    }

    // A pyramid of a pyramid has the same pixels.
    void Build() {
        if (raster.MinLevel() != 0 ||
            std::uint64_t{raster.Width()} * raster.Height() * raster.Bands() > kMostBuilt)
            return;
        static const zmcfuzz::ScratchFolder folder;
        FromRaster source(raster);
        zmchost::BuildOptions options;
        options.overwrite = true;
        options.threads = 1;
        options.statistics = script.Flag();
        zmchost::PyramidBuilder(zmcfuzz::TheModule()).Build(source, folder / "b.pyr", options);
        Raster built = Raster::Open(zmcfuzz::TheModule(), folder / "b.pyr");
        ZMC_EXPECT(built.Bands() == raster.Bands() && built.PixelType() == raster.PixelType());
        const Window whole{0, 0, raster.Width(), raster.Height()};
        std::vector<unsigned char> one(Samples(whole, raster.AllBands()) * raster.SampleSize());
        std::vector<unsigned char> other(one.size());
        raster.Read(0, whole, raster.AllBands(), one.data());
        built.Read(0, whole, raster.AllBands(), other.data());
        ZMC_EXPECT(one == other);
    }

    void Describe() {
        static_cast<void>(raster.Change());
        static_cast<void>(raster.NoDataValue(0));
        raster.SetNoDataValues({{script.UpTo(3), script.Byte() - 3.0}});
        ZMC_EXPECT(raster.TileSide() == raster.Header().tileSize);
    }
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    zmcfuzz::FileAndScript input = zmcfuzz::FileAndScript::Take(data, size);
    const zmchost::ModulePtr& module = zmcfuzz::TheModule();
    const auto header = zmcfuzz::HeaderIn(input.file);
    if (header && !zmcfuzz::IsAffordable(*header)) return 0;
    if (header) static_cast<void>(zmchost::DescribePyramidFile(*header));
    try {
        Raster raster = Raster::Open(module, zmcfuzz::SourceOf(input.file), "a.pyr");
        ZMC_EXPECT(header && raster.Bands() == header->bandCount);
        if (raster.Bands() != 0) Session(raster, input.script).Run();
    } catch (const zmchost::Error& error) {
        ZMC_EXPECT(!error.Reason().empty());
    }
    return 0;
}
