// Tiles and masks of memory rasters, each beside the loop that could do it with the least work.
// Every name tells element type, interleave and case; "ratio" is the share of the bound's rate.
#include <cstring>
#include <memory>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include "bench/Comparison.h"
#include "connection/MemoryRasterDataConnection.h"
#include "core/ElementTypes.h"
#include "core/NumericConversion.h"
#include "core/PixelVocabulary.h"
#include "dispatch/NoDataMask.h"
#include "dispatch/NoDataRule.h"
#include "tests/support/MemoryRaster.h"
#include "tests/support/TileModel.h"

namespace zelm {
namespace {

using zmctest::Argument;
using zmctest::ListView;
using zmctest::MemoryRasterText;
using zmctest::Samples;

constexpr std::uint32_t kSamples = 512, kLines = 256, kBands = 3, kFirstLine = 32, kTileLines = 192;

template <class T>
struct Raster {
    std::vector<T> pixels;
    std::vector<T> tile = std::vector<T>(pixels.size());
    std::vector<unsigned char> mask = std::vector<unsigned char>(pixels.size());
    MemoryRasterDataConnection connection;
    RasterReaderDispatchPtr dispatch;

    explicit Raster(std::int32_t interleave, std::size_t bands = kBands)
        : pixels(Samples<T>(std::size_t{kSamples} * kLines * bands)) {
        connection.Open(Argument({MemoryRasterText(pixels.data())
                                      .Size(kSamples, kLines, bands)
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
    void Write(std::vector<int>& list) {
        Reader().WriteTile(0, kFirstLine, kSamples, kTileLines, ListView(list), 0, tile.data(),
                           mask.data());
    }
};

// The bound of whole lines of all bands: one copy of as many bytes.
template <class T>
void WholeLines(benchmark::State& state, std::int32_t interleave) {
    Raster<T> raster(interleave);
    std::vector<int> list = zmctest::AllBands(kBands);
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

// Some of the bands of pixel-interleaved rasters, by loops to which the compiler knows all of them.
template <class T, std::size_t kOf, int... kList>
void ReadPlainly(const T* __restrict raster, T* __restrict tile, std::size_t pixels) {
    for (std::size_t i = 0; i < pixels; ++i, tile += sizeof...(kList), raster += kOf) {
        std::size_t k = 0;
        ((tile[k++] = raster[kList]), ...);
    }
}

template <class T, std::size_t kOf, int... kList>
void WritePlainly(T* __restrict raster, const T* __restrict tile, std::size_t pixels) {
    for (std::size_t i = 0; i < pixels; ++i, tile += sizeof...(kList), raster += kOf) {
        std::size_t k = 0;
        ((raster[kList] = tile[k++]), ...);
    }
}

template <class T, std::size_t kOf, int... kList>
void PixelsRead(benchmark::State& state) {
    Raster<T> raster(Interleave::BIP, kOf);
    std::vector<int> list{kList...};
    std::vector<T> other(raster.tile.size());
    const std::size_t pixels = std::size_t{kSamples} * kTileLines;
    bench::Compare(
        state, pixels * sizeof...(kList) * sizeof(T), [&] { raster.Read(list); },
        [&] {
            ReadPlainly<T, kOf, kList...>(
                raster.pixels.data() + std::size_t{kFirstLine} * kSamples * kOf, other.data(),
                pixels);
        });
}

template <class T, std::size_t kOf, int... kList>
void PixelsWritten(benchmark::State& state) {
    Raster<T> raster(Interleave::BIP, kOf);
    std::vector<int> list{kList...};
    std::vector<T> other(raster.pixels.size());
    const std::size_t pixels = std::size_t{kSamples} * kTileLines;
    bench::Compare(
        state, pixels * sizeof...(kList) * sizeof(T), [&] { raster.Write(list); },
        [&] {
            WritePlainly<T, kOf, kList...>(other.data() + std::size_t{kFirstLine} * kSamples * kOf,
                                           raster.tile.data(), pixels);
        });
}

// Rules of which the compiler knows the kind: kValues of the bands, the first ones, have a value.
template <class T, std::uint32_t kValues>
struct PlainRules {
    T values[kBands];

    template <std::uint32_t kBand>
    unsigned char Marked(unsigned char byte, const T& x) const {
        const NoDataRule<T> rule{kBand < kValues, values[kBand]};
        return static_cast<unsigned char>((byte & 0xFE) | static_cast<unsigned>(rule.Marks(x)));
    }
    template <std::uint32_t kBand>
    T Stamped(unsigned char byte, const T& x) const {
        const T value = values[kBand];
        return kBand < kValues && (byte & 1) != 0 ? value : x;
    }
};

constexpr std::uint32_t kSide = 256;

enum class Layout { OneBand, Lines, Pixels, PixelsAlike };

// Sizes come with the tile: the loops do not know them beforehand.
template <Layout kLayout, class Run, class Pixel>
void VisitPlainly(Run&& run, Pixel&& pixel) {
    std::size_t side = kSide;
    benchmark::DoNotOptimize(side);
    const std::size_t plane = side * side;
    if constexpr (kLayout == Layout::OneBand) {
        run(std::integral_constant<std::uint32_t, 0>(), 0, plane);
    } else if constexpr (kLayout == Layout::PixelsAlike) {
        run(std::integral_constant<std::uint32_t, 0>(), 0, plane * kBands);
    } else if constexpr (kLayout == Layout::Pixels) {
        for (std::size_t i = 0; i < plane; ++i) pixel(i * kBands);
    } else {
        for (std::size_t line = 0; line < side; ++line) {
            const std::size_t at = line * kBands * side;
            run(std::integral_constant<std::uint32_t, 0>(), at, side);
            run(std::integral_constant<std::uint32_t, 1>(), at + side, side);
            run(std::integral_constant<std::uint32_t, 2>(), at + 2 * side, side);
        }
    }
}

template <Layout kLayout, class T, std::uint32_t kValues>
void MarkPlainly(const PlainRules<T, kValues> rules, const T* __restrict samples,
                 unsigned char* __restrict mask) {
    VisitPlainly<kLayout>(
        [=](auto band, std::size_t at, std::size_t count) {
            for (std::size_t i = at; i < at + count; ++i)
                mask[i] = rules.template Marked<band()>(mask[i], samples[i]);
        },
        [=](std::size_t at) {
            mask[at] = rules.template Marked<0>(mask[at], samples[at]);
            mask[at + 1] = rules.template Marked<1>(mask[at + 1], samples[at + 1]);
            mask[at + 2] = rules.template Marked<2>(mask[at + 2], samples[at + 2]);
        });
}

template <Layout kLayout, class T, std::uint32_t kValues>
void StampPlainly(const PlainRules<T, kValues> rules, T* __restrict samples,
                  const unsigned char* __restrict mask) {
    VisitPlainly<kLayout>(
        [=](auto band, std::size_t at, std::size_t count) {
            for (std::size_t i = at; i < at + count; ++i)
                samples[i] = rules.template Stamped<band()>(mask[i], samples[i]);
        },
        [=](std::size_t at) {
            samples[at] = rules.template Stamped<0>(mask[at], samples[at]);
            samples[at + 1] = rules.template Stamped<1>(mask[at + 1], samples[at + 1]);
            samples[at + 2] = rules.template Stamped<2>(mask[at + 2], samples[at + 2]);
        });
}

// A raster whose first kValues bands have a no-data value, and the same told to plain loops.
template <class T, Layout kLayout, std::uint32_t kValues>
struct Masked {
    static constexpr std::uint32_t kCount = kLayout == Layout::OneBand ? 1 : kBands;
    static constexpr std::size_t kBytes = std::size_t{kSide} * kSide * kCount * (sizeof(T) + 1);

    Raster<T> raster{kLayout == Layout::OneBand ? Interleave::BSQ
                     : kLayout == Layout::Lines ? Interleave::BIL
                                                : Interleave::BIP};
    PlainRules<T, kValues> rules;

    Masked() {
        RasterProps noData;
        noData.SetBands(kBands);
        for (std::uint32_t b = 0; b < kBands; ++b) {
            const double value = kLayout == Layout::PixelsAlike ? 5 : 5 + b;
            rules.values[b] = FromDouble<T>(value);
            if (b < kValues) noData.SetNoDataValue(b, value);
        }
        raster.Reader().SetNoDataValues(noData);
    }
};

template <class T, Layout kLayout, std::uint32_t kValues>
void Mask(benchmark::State& state) {
    Masked<T, kLayout, kValues> tile;
    std::vector<unsigned char> other(tile.raster.mask.size());
    bench::Compare(
        state, tile.kBytes,
        [&] {
            ComputeNoDataMask<T>(tile.raster.Reader(), kSide, kSide, tile.kCount,
                                 tile.raster.pixels.data(), tile.raster.mask.data());
        },
        [&] {
            MarkPlainly<kLayout>(tile.rules, std::as_const(tile.raster.pixels).data(),
                                 other.data());
        });
}

template <class T, Layout kLayout, std::uint32_t kValues>
void Stamp(benchmark::State& state) {
    Masked<T, kLayout, kValues> tile;
    std::vector<unsigned char>& mask = tile.raster.mask;
    for (std::size_t i = 0; i < mask.size(); i += 1 + i * 7 % 5) mask[i] = 1;
    std::vector<T> other = tile.raster.pixels;
    bench::Compare(
        state, tile.kBytes,
        [&] {
            ApplyNoDataMask<T>(tile.raster.Reader(), kSide, kSide, tile.kCount,
                               tile.raster.pixels.data(), mask.data());
        },
        [&] { StampPlainly<kLayout>(tile.rules, other.data(), std::as_const(mask).data()); });
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
void RegisterPixels() {
    const std::string name = std::string("/") + ElementTraits<T>::word + "/";
    Register("Read" + name + "2of5", PixelsRead<T, 5, 1, 3>);
    Register("Read" + name + "Reversed", PixelsRead<T, 3, 2, 1, 0>);
    Register("Read" + name + "3of4", PixelsRead<T, 4, 0, 1, 2>);
    Register("Read" + name + "5of6", PixelsRead<T, 6, 0, 2, 3, 4, 5>);
    Register("Write" + name + "1of3", PixelsWritten<T, 3, 1>);
    Register("Write" + name + "2of3", PixelsWritten<T, 3, 2, 0>);
    Register("Write" + name + "Reversed", PixelsWritten<T, 3, 2, 1, 0>);
    Register("Write" + name + "3of4", PixelsWritten<T, 4, 0, 1, 2>);
}

template <class T>
void RegisterMasks() {
    const std::string name = std::string("/") + ElementTraits<T>::word;
    Register("Mask" + name + "/OneBand", Mask<T, Layout::OneBand, 1>);
    Register("Mask" + name + "/BIL", Mask<T, Layout::Lines, kBands>);
    Register("Mask" + name + "/BIP", Mask<T, Layout::Pixels, kBands>);
    Register("Mask" + name + "/BIPWithAndWithoutValue", Mask<T, Layout::Pixels, 2>);
    Register("Mask" + name + "/BIPSameValue", Mask<T, Layout::PixelsAlike, kBands>);
    Register("Stamp" + name + "/OneBand", Stamp<T, Layout::OneBand, 1>);
    Register("Stamp" + name + "/BIP", Stamp<T, Layout::Pixels, kBands>);
    Register("Stamp" + name + "/BIPWithAndWithoutValue", Stamp<T, Layout::Pixels, 2>);
}

// One element type for each sample size: tiles know no more of a type.
[[maybe_unused]] const bool registered = [] {
    for (const std::int32_t interleave : zmctest::kInterleaves) {
        RegisterTiles<unsigned char>(interleave);
        RegisterTiles<unsigned short>(interleave);
        RegisterTiles<float>(interleave);
        RegisterTiles<double>(interleave);
        RegisterTiles<Complex<double>>(interleave);
    }
    RegisterPixels<unsigned char>();
    RegisterPixels<unsigned short>();
    RegisterPixels<float>();
    RegisterPixels<double>();
    RegisterPixels<Complex<double>>();
#define ZMC_X(type, name, code) RegisterMasks<type>();
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
    return true;
}();

}  // namespace
}  // namespace zelm
