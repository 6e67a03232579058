// A tile of 256 x 256 pixels as a picture, beside the codec alone: what rendering adds to the
// coding of a tile, which nobody who serves pictures can go below.
#include <benchmark/benchmark.h>

#include <cmath>
#include <string>
#include <type_traits>
#include <vector>

#include "render/Codec.h"
#include "render/Renderer.h"

namespace {

using zmcrender::Picture;
using zmcrender::PictureFormat;
using zmcrender::Renderer;
using zmcrender::Style;

constexpr std::uint32_t kSide = 256;

// Waves of some sizes with a little noise, so that codecs have about the work of a photograph.
template <class T>
std::vector<T> Scene(std::uint32_t bands) {
    std::vector<T> samples;
    std::uint32_t noise = 1;
    for (std::uint32_t y = 0; y < kSide; ++y)
        for (std::uint32_t x = 0; x < kSide; ++x)
            for (std::uint32_t band = 0; band < bands; ++band) {
                noise = noise * 1664525 + 1013904223;
                const double wave = std::sin(x / 19.0 + band) * std::cos(y / 31.0) * 60 +
                                    std::sin((x + y) / 5.0) * 20 + (noise >> 29);
                samples.push_back(static_cast<T>(120 + wave));
            }
    return samples;
}

// A tile that tells of itself and of its records; no sample is read of it.
template <class T>
struct Tile final : zmcrender::PixelSource {
    explicit Tile(std::uint32_t bandCount) : bands(bandCount) {}
    std::uint32_t bands;
    std::string Name() const override { return "tile"; }
    std::uint32_t PixelType() const override { return zelm::ElementTraits<T>::code; }
    std::uint32_t Bands() const override { return bands; }
    std::uint32_t MinLevel() const override { return 0; }
    std::uint32_t MaxLevel() const override { return 0; }
    std::uint32_t Width(std::uint32_t) const override { return kSide; }
    std::uint32_t Height(std::uint32_t) const override { return kSide; }
    std::uint32_t TileSide() const override { return kSide; }
    void Read(std::uint32_t, const zmchost::Window&, std::span<const std::uint32_t>,
              void*) override {}
};

template <class T>
struct Subject {
    std::vector<T> samples;
    Renderer renderer;

    Subject(std::uint32_t bands, const Style& style, bool noData = false)
        : samples(Scene<T>(bands)), renderer(Made(bands, style, noData)) {}
    Picture Render() const {
        return renderer.Render({.data = samples.data(), .width = kSide, .height = kSide});
    }

private:
    static Renderer Made(std::uint32_t bands, const Style& style, bool noData) {
        Tile<T> tile(bands);
        zmcrender::RasterFacts facts{"tile", tile.PixelType(),
                                     std::vector<zmcrender::BandFacts>(bands)};
        for (auto& band : facts.bands)
            if (noData) band.noData = zmcrender::Number(0);
        return Renderer(facts, style, tile);
    }
};

Style Styled(std::initializer_list<std::pair<const char*, const char*>> pairs) {
    Style style;
    for (const auto& [key, value] : pairs) style.Set(key, value);
    return style;
}

template <class T>
void RunRender(benchmark::State& state, const Subject<T>& subject) {
    for (auto _ : state) benchmark::DoNotOptimize(subject.Render().bytes.data());
}

void RenderBytes(benchmark::State& state) { RunRender(state, Subject<unsigned char>(3, {})); }
void RenderBytesWithNoData(benchmark::State& state) {
    RunRender(state, Subject<unsigned char>(3, {}, true));
}
void RenderStretchedBytes(benchmark::State& state) {
    RunRender(state, Subject<unsigned char>(3, Styled({{"stretch", "20,200"}, {"gamma", "2.2"}})));
}
void RenderUInt16(benchmark::State& state) {
    RunRender(state, Subject<unsigned short>(3, Styled({{"stretch", "20,200"}})));
}
void RenderSingle(benchmark::State& state) {
    RunRender(state, Subject<float>(3, Styled({{"stretch", "20,200"}})));
}
void RenderSingleWithGamma(benchmark::State& state) {
    RunRender(state, Subject<float>(3, Styled({{"stretch", "20,200"}, {"gamma", "2.2"}})));
}
void RenderColourMap(benchmark::State& state) {
    RunRender(state, Subject<float>(1, Styled({{"stretch", "20,200"}, {"colormap", "turbo"}})));
}
void RenderExpression(benchmark::State& state) {
    RunRender(state, Subject<unsigned short>(
                         4, Styled({{"expression", "(b4-b3)/(b4+b3)"}, {"stretch", "-1,1"}})));
}

const char* const kFormats[] = {"jpg", "png", "webp"};

void CodeAlone(benchmark::State& state) {
    const auto format = static_cast<PictureFormat>(state.range(0));
    const Picture picture = Subject<unsigned char>(3, {}).Render();
    for (auto _ : state) benchmark::DoNotOptimize(Encode(picture, format).data());
    state.SetLabel(kFormats[state.range(0)]);
}

void RenderAndCode(benchmark::State& state) {
    const auto format = static_cast<PictureFormat>(state.range(0));
    const Subject<unsigned char> subject(3, {});
    for (auto _ : state) benchmark::DoNotOptimize(Encode(subject.Render(), format).data());
    state.SetLabel(kFormats[state.range(0)]);
}

BENCHMARK(RenderBytes)->Unit(benchmark::kMicrosecond);
BENCHMARK(RenderBytesWithNoData)->Unit(benchmark::kMicrosecond);
BENCHMARK(RenderStretchedBytes)->Unit(benchmark::kMicrosecond);
BENCHMARK(RenderUInt16)->Unit(benchmark::kMicrosecond);
BENCHMARK(RenderSingle)->Unit(benchmark::kMicrosecond);
BENCHMARK(RenderSingleWithGamma)->Unit(benchmark::kMicrosecond);
BENCHMARK(RenderColourMap)->Unit(benchmark::kMicrosecond);
BENCHMARK(RenderExpression)->Unit(benchmark::kMicrosecond);
BENCHMARK(CodeAlone)->DenseRange(0, 2)->Unit(benchmark::kMicrosecond);
BENCHMARK(RenderAndCode)->DenseRange(0, 2)->Unit(benchmark::kMicrosecond);

}  // namespace
