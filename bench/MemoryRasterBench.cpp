// Tiles and masks of memory rasters, each beside the loop that could do it with the least work.
// Every name tells element type, interleave and case; "ratio" is the share of the bound's rate.
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "bench/Comparison.h"
#include "connection/MemoryRasterDataConnection.h"
#include "core/ElementTypes.h"
#include "core/NumericConversion.h"
#include "core/PixelVocabulary.h"
#include "dispatch/NoDataMask.h"
#include "tests/support/MemoryRaster.h"
#include "tests/support/TileModel.h"

namespace zelm {
namespace {

using test::Argument;
using test::ListView;
using test::MemoryRasterText;
using test::Samples;

constexpr std::uint32_t kSamples = 512, kLines = 256, kBands = 3, kFirstLine = 32, kTileLines = 192;

template <class T>
struct Raster {
    std::vector<T> pixels = Samples<T>(std::size_t{kSamples} * kLines * kBands);
    std::vector<T> tile = std::vector<T>(pixels.size());
    std::vector<unsigned char> mask = std::vector<unsigned char>(pixels.size());
    MemoryRasterDataConnection connection;
    RasterReaderDispatchPtr dispatch;

    explicit Raster(std::int32_t interleave) {
        connection.Open(Argument({MemoryRasterText(pixels.data())
                                      .Size(kSamples, kLines, kBands)
                                      .Layout(interleave)
                                      .Type(ElementTraits<T>::code)
                                      .Text()}),
                        GeoRefPtr(), MetadataPtr());
        dispatch = connection.GetReader();
    }

    RasterReader<T>& Reader() { return *dispatch->template As<T>(); }

    void Read(std::vector<int>& list) {
        Reader().ReadTile(0, kFirstLine, kSamples, kTileLines, ListView(list), 0, tile.data(),
                          nullptr);
    }
};

// The bound of whole lines of all bands: one copy of as many bytes.
template <class T>
void WholeLines(benchmark::State& state, std::int32_t interleave) {
    Raster<T> raster(interleave);
    std::vector<int> list = test::AllBands(kBands);
    std::vector<T> other(raster.tile.size());
    const std::size_t bands = interleave == Interleave::None ? 1 : kBands;
    const std::size_t bytes = std::size_t{kSamples} * kTileLines * bands * sizeof(T);
    bench::Compare(
        state, bytes, [&] { raster.Read(list); },
        [&] { std::memcpy(other.data(), raster.pixels.data(), bytes); });
}

// Two of three bands, in reverse. The bound is written for this one case.
template <class T>
void CopySubset(std::int32_t interleave, const T* pixels, T* tile) {
    constexpr std::size_t kPlane = std::size_t{kSamples} * kLines;
    constexpr int kList[] = {2, 0};
    if (interleave == Interleave::BIP) {
        const T* from = pixels + std::size_t{kFirstLine} * kSamples * kBands;
        for (std::size_t i = 0; i < std::size_t{kTileLines} * kSamples; ++i) {
            tile[2 * i] = from[3 * i + 2];
            tile[2 * i + 1] = from[3 * i];
        }
        return;
    }
    for (std::size_t k = 0; k < 2; ++k) {
        for (std::size_t l = 0; l < kTileLines; ++l) {
            const auto b = static_cast<std::size_t>(kList[k]);
            const bool lineFirst = interleave == Interleave::BIL;
            const T* from = pixels + (lineFirst ? ((l + kFirstLine) * kBands + b) * kSamples
                                                : b * kPlane + (l + kFirstLine) * kSamples);
            T* to = tile + (lineFirst ? l * 2 + k : k * kTileLines + l) * kSamples;
            for (std::size_t s = 0; s < kSamples; ++s) to[s] = from[s];
        }
    }
}

template <class T>
void BandSubset(benchmark::State& state, std::int32_t interleave) {
    Raster<T> raster(interleave);
    std::vector<int> list{2, 0};
    std::vector<T> other(raster.tile.size());
    bench::Compare(
        state, std::size_t{kSamples} * kTileLines * 2 * sizeof(T), [&] { raster.Read(list); },
        [&] { CopySubset(interleave, raster.pixels.data(), other.data()); });
}

// One of three bands.
template <class T>
void SingleBand(benchmark::State& state, std::int32_t interleave) {
    Raster<T> raster(interleave);
    std::vector<int> list{1};
    std::vector<T> other(raster.tile.size());
    const std::size_t pixels = std::size_t{kSamples} * kTileLines;
    bench::Compare(
        state, pixels * sizeof(T), [&] { raster.Read(list); },
        [&] {
            const T* from = raster.pixels.data() + std::size_t{kFirstLine} * kSamples * kBands;
            for (std::size_t i = 0; i < pixels; ++i) other[i] = from[3 * i + 1];
        });
}

// The mask of a tile, against a loop that reads its pixels and writes its mask bytes.
template <class T>
void Mask(benchmark::State& state, std::int32_t interleave, std::uint32_t bands,
          std::uint32_t values) {
    constexpr std::uint32_t kSide = 256;
    Raster<T> raster(interleave);
    RasterProps noData;
    noData.SetBands(kBands);
    for (std::uint32_t b = 0; b < values; ++b) noData.SetNoDataValue(b, 5 + b);
    raster.Reader().SetNoDataValues(noData);
    std::vector<unsigned char> other(raster.mask.size());
    const std::size_t samples = std::size_t{kSide} * kSide * bands;
    bench::Compare(
        state, samples * (sizeof(T) + 1),
        [&] {
            ComputeNoDataMask<T>(raster.Reader(), kSide, kSide, bands, raster.pixels.data(),
                                 raster.mask.data());
        },
        [&] {
            const T value = FromDouble<T>(5);
            const T* __restrict const from = raster.pixels.data();
            unsigned char* __restrict const to = other.data();
            for (std::size_t i = 0; i < samples; ++i)
                to[i] = static_cast<unsigned char>((to[i] & 0xFE) | (from[i] == value ? 1 : 0));
        });
}

template <class Run>
void Register(const std::string& name, Run run) {
    benchmark::RegisterBenchmark(name.c_str(), run)->UseManualTime()->Unit(benchmark::kMicrosecond);
}

template <class T>
void RegisterTiles(std::int32_t interleave) {
    const std::string name =
        std::string("/") + ElementTraits<T>::word + "/" + InterleaveName(interleave);
    Register("WholeLines" + name,
             [interleave](benchmark::State& state) { WholeLines<T>(state, interleave); });
    if (interleave == Interleave::None) return;
    Register("BandSubset" + name,
             [interleave](benchmark::State& state) { BandSubset<T>(state, interleave); });
    if (interleave == Interleave::BIP)
        Register("SingleBand" + name,
                 [interleave](benchmark::State& state) { SingleBand<T>(state, interleave); });
}

template <class T>
void RegisterMasks() {
    const std::string name = std::string("Mask/") + ElementTraits<T>::word;
    Register(name + "/OneBand",
             [](benchmark::State& state) { Mask<T>(state, Interleave::BSQ, 1, 1); });
    Register(name + "/BIL",
             [](benchmark::State& state) { Mask<T>(state, Interleave::BIL, kBands, kBands); });
    Register(name + "/BIP",
             [](benchmark::State& state) { Mask<T>(state, Interleave::BIP, kBands, kBands); });
    Register(name + "/BIPWithAndWithoutValue",
             [](benchmark::State& state) { Mask<T>(state, Interleave::BIP, kBands, 2); });
}

// One element type for each sample size: tiles know no more of a type.
[[maybe_unused]] const bool registered = [] {
    for (const std::int32_t interleave : test::kInterleaves) {
        RegisterTiles<unsigned char>(interleave);
        RegisterTiles<unsigned short>(interleave);
        RegisterTiles<float>(interleave);
        RegisterTiles<double>(interleave);
        RegisterTiles<Complex<double>>(interleave);
    }
#define ZMC_X(type, name, code) RegisterMasks<type>();
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
    return true;
}();

}  // namespace
}  // namespace zelm
