// Reduction, statistics and histograms of one row pair after another, beside a copy of the same
// source bytes: the bound for anything that has to look at each of them once.
#include <benchmark/benchmark.h>

#include <cstring>
#include <random>
#include <vector>

#include "host/reduce/Reduction.h"
#include "host/statistics/BandStatistics.h"
#include "host/statistics/Histogram.h"
#include "host/statistics/ValueCounter.h"

namespace {

using zmchost::Resampling;

constexpr std::uint32_t kWidth = 16384;
constexpr std::uint32_t kRows = 64;  // larger than the caches next to the processor

template <class T>
struct Scene {
    std::uint32_t bands;
    std::vector<T> samples;
    std::vector<unsigned char> masks;
    std::vector<T> out;
    std::vector<unsigned char> outMask;

    explicit Scene(std::uint32_t bandCount)
        : bands(bandCount),
          samples(std::size_t{kWidth} * kRows * bandCount),
          masks(samples.size()),
          out(std::size_t{kWidth} / 2 * bandCount),
          outMask(out.size()) {
        std::minstd_rand random(1);
        for (T& sample : samples) sample = static_cast<T>(random() % 200);
    }
    std::size_t Stride() const { return std::size_t{kWidth} * bands; }
    std::int64_t Bytes() const { return static_cast<std::int64_t>(samples.size() * sizeof(T)); }
};

template <class T>
void Copy(benchmark::State& state) {
    Scene<T> scene(static_cast<std::uint32_t>(state.range(0)));
    std::vector<T> target(scene.Stride() * 2);
    for (auto _ : state) {
        for (std::uint32_t y = 0; y < kRows; y += 2) {
            std::memcpy(target.data(), scene.samples.data() + y * scene.Stride(),
                        2 * scene.Stride() * sizeof(T));
            benchmark::DoNotOptimize(target.data());
            benchmark::ClobberMemory();
        }
    }
    state.SetBytesProcessed(state.iterations() * scene.Bytes());
}

enum Masking { Unmasked, NothingMarked, Holes, Noise };

template <class T>
void Mark(Scene<T>& scene, Masking masking) {
    std::minstd_rand random(2);
    if (masking == Holes) {  // a tenth of the row, in three pieces
        for (std::uint32_t y = 0; y < kRows; ++y)
            for (std::uint32_t piece = 0; piece < 3; ++piece)
                std::memset(scene.masks.data() + y * scene.Stride() + piece * scene.Stride() / 3, 1,
                            scene.Stride() / 30);
    } else if (masking == Noise) {  // every tenth sample, anywhere
        for (unsigned char& mask : scene.masks) mask = random() % 10 == 0 ? 1 : 0;
    }
}

template <class T, Resampling method, Masking masking>
void Reduce(benchmark::State& state) {
    Scene<T> scene(static_cast<std::uint32_t>(state.range(0)));
    Mark(scene, masking);
    const std::uint32_t halo = zmchost::ReductionHalo(method);
    std::vector<zelm::NoDataRule<T>> rules(scene.bands, zelm::NoDataRule<T>{true, T(250)});
    const T* rows[12];
    const unsigned char* masks[12];
    for (auto _ : state) {
        for (std::uint32_t y = 0; y < kRows; y += 2) {
            for (std::uint32_t r = 0; r < 2 + 2 * halo; ++r) {
                const std::size_t row = (y + r + kRows - halo) % kRows;
                rows[r] = scene.samples.data() + row * scene.Stride();
                masks[r] = scene.masks.data() + row * scene.Stride();
            }
            const zmchost::ReductionRows<T> source{rows, masking == Unmasked ? nullptr : masks};
            zmchost::ReduceRow<T>(method, scene.bands, kWidth, source,
                                  masking == Unmasked ? nullptr : rules.data(), scene.out.data(),
                                  masking == Unmasked ? nullptr : scene.outMask.data());
            benchmark::DoNotOptimize(scene.out.data());
            benchmark::ClobberMemory();
        }
    }
    state.SetBytesProcessed(state.iterations() * scene.Bytes());
}

template <class Gatherer, class T>
void Gather(benchmark::State& state, Gatherer prototype) {
    Scene<T> scene(static_cast<std::uint32_t>(state.range(0)));
    std::vector<Gatherer> gatherers(scene.bands, prototype);
    for (auto _ : state) {
        for (std::uint32_t y = 0; y < kRows; ++y)
            for (std::uint32_t band = 0; band < scene.bands; ++band)
                gatherers[band].AddRow(scene.samples.data() + y * scene.Stride(), nullptr, band,
                                       scene.bands, kWidth);
        benchmark::ClobberMemory();
    }
    state.SetBytesProcessed(state.iterations() * scene.Bytes());
}

template <class T>
void Statistics(benchmark::State& state) {
    Gather<zmchost::BandAccumulator<T>, T>(state, {});
}
template <class T>
void Values(benchmark::State& state) {
    Gather<zmchost::ValueCounter<T>, T>(state, {});
}
template <class T>
void Bins(benchmark::State& state) {
    const zmchost::HistogramBins<T> bins(T(0), T(199));
    Gather<zmchost::HistogramAccumulator<T>, T>(state, zmchost::HistogramAccumulator<T>(bins));
}

BENCHMARK(Copy<unsigned char>)->Arg(3);
BENCHMARK(Reduce<unsigned char, Resampling::Average, Unmasked>)->Arg(1)->Arg(3)->Arg(4)->Arg(8);
BENCHMARK(Reduce<unsigned char, Resampling::Average, NothingMarked>)->Arg(1)->Arg(3);
BENCHMARK(Reduce<unsigned char, Resampling::Average, Holes>)->Arg(1)->Arg(3);
BENCHMARK(Reduce<unsigned char, Resampling::Average, Noise>)->Arg(1)->Arg(3);
BENCHMARK(Copy<unsigned short>)->Arg(3);
BENCHMARK(Reduce<unsigned short, Resampling::Average, Unmasked>)->Arg(1)->Arg(3)->Arg(4);
BENCHMARK(Reduce<short, Resampling::Average, Unmasked>)->Arg(1)->Arg(3)->Arg(4);
BENCHMARK(Copy<float>)->Arg(3);
BENCHMARK(Reduce<float, Resampling::Average, Unmasked>)->Arg(1)->Arg(3)->Arg(4);
BENCHMARK(Reduce<float, Resampling::Average, NothingMarked>)->Arg(1);
BENCHMARK(Reduce<float, Resampling::Average, Noise>)->Arg(1);
BENCHMARK(Reduce<int, Resampling::Average, Unmasked>)->Arg(1);
BENCHMARK(Reduce<double, Resampling::Average, Unmasked>)->Arg(1);
BENCHMARK(Reduce<std::int64_t, Resampling::Average, Unmasked>)->Arg(1);
BENCHMARK(Reduce<unsigned char, Resampling::Nearest, Unmasked>)->Arg(3);
BENCHMARK(Reduce<unsigned char, Resampling::Rms, Unmasked>)->Arg(3);
BENCHMARK(Reduce<unsigned char, Resampling::Mode, Unmasked>)->Arg(3);
BENCHMARK(Reduce<unsigned char, Resampling::Maximum, Unmasked>)->Arg(3);
BENCHMARK(Reduce<unsigned char, Resampling::Median, Unmasked>)->Arg(3);
BENCHMARK(Reduce<unsigned char, Resampling::Bilinear, Unmasked>)->Arg(3);
BENCHMARK(Reduce<unsigned char, Resampling::Cubic, Unmasked>)->Arg(3);
BENCHMARK(Reduce<unsigned char, Resampling::Cubic, Noise>)->Arg(3);
BENCHMARK(Reduce<unsigned char, Resampling::Lanczos, Unmasked>)->Arg(3);
BENCHMARK(Reduce<float, Resampling::Lanczos, Unmasked>)->Arg(1);
BENCHMARK(Statistics<unsigned char>)->Arg(1)->Arg(3);
BENCHMARK(Statistics<unsigned short>)->Arg(1);
BENCHMARK(Statistics<int>)->Arg(1);
BENCHMARK(Statistics<std::int64_t>)->Arg(1);
BENCHMARK(Statistics<float>)->Arg(1);
BENCHMARK(Statistics<double>)->Arg(1);
BENCHMARK(Values<unsigned char>)->Arg(1)->Arg(3);
BENCHMARK(Values<unsigned short>)->Arg(1);
BENCHMARK(Bins<unsigned short>)->Arg(1);
BENCHMARK(Bins<int>)->Arg(1);
BENCHMARK(Bins<std::int64_t>)->Arg(1);
BENCHMARK(Bins<float>)->Arg(1);
BENCHMARK(Bins<double>)->Arg(1);

}  // namespace
