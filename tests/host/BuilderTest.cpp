// Pyramids as the builder makes them, held against levels made the simple way.
#include "host/build/PyramidBuilder.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <filesystem>
#include <iterator>
#include <limits>
#include <random>

#include "core/PixelVocabulary.h"
#include "host/raster/Raster.h"
#include "host/statistics/BandStatistics.h"
#include "host/statistics/HistogramBins.h"
#include "tests/host/NaivePyramid.h"
#include "tests/host/Palettes.h"
#include "tests/support/FailureOf.h"
#include "tests/support/MemorySource.h"
#include "tests/support/Sanitizers.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

using zmctest::MemorySource;
using zmctest::ScratchDirectory;
using zmctest::TestModule;

constexpr Resampling kMethods[] = {
    Resampling::Nearest, Resampling::Average, Resampling::Rms,    Resampling::Mode,
    Resampling::Minimum, Resampling::Maximum, Resampling::Median, Resampling::Bilinear,
    Resampling::Cubic,   Resampling::Lanczos, Resampling::Gauss,  Resampling::CubicSpline};
static_assert(std::size(kMethods) == kResamplings);

template <class T>
bool SameBytes(const std::vector<T>& a, const std::vector<T>& b) {
    return a.size() == b.size() && std::memcmp(a.data(), b.data(), a.size() * sizeof(T)) == 0;
}

// Every level of the file, against the source and against the level below.
template <class T>
void ExpectPyramidOf(const MemorySource<T>& source, const std::string& file, Resampling method) {
    Raster raster = Raster::Open(TestModule(), file);
    ASSERT_TRUE(raster.IsComplete());
    std::vector<zelm::NoDataRule<T>> rules;
    for (std::uint32_t band = 0; band < source.props.bands; ++band)
        rules.push_back(RuleOfBand<T>(source.props, band));
    std::vector<T> expected = source.pixels;
    for (std::uint32_t level = 0; level <= raster.MaxLevel(); ++level) {
        if (level > 0)
            expected = zmctest::NaiveReduce(expected, raster.Width(level - 1),
                                            raster.Height(level - 1), method, rules);
        const std::vector<T> stored =
            raster.Read<T>(level, {0, 0, raster.Width(level), raster.Height(level)});
        EXPECT_TRUE(SameBytes(stored, expected))
            << zelm::ElementTraits<T>::word << " " << ResamplingName(method) << " level " << level;
    }
}

template <class T>
void ExpectAllMethods() {
    const ScratchDirectory folder;
    const PyramidBuilder builder(TestModule());
    MemorySource<T> source(701, 523, 2);
    source.FillWithNoise(5);
    for (const Resampling method : kMethods) {
        if (!SupportsElementType(method, source.props.pixelType)) continue;
        BuildOptions options;
        options.resampling = method;
        options.overwrite = true;
        options.threads = 2;
        const BuildReport report = builder.Build(source, folder / "a.zmc", options);
        EXPECT_EQ(report.maxLevel, 2u);
        ExpectPyramidOf(source, folder / "a.zmc", method);
    }
}

TEST(PyramidBuilder, BuildsEveryTypeByEveryMethod) {
#define ZMC_X(type, name, code) ExpectAllMethods<type>();
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
}

TEST(PyramidBuilder, KeepsInvalidSamplesOutOfEveryLevel) {
    const ScratchDirectory folder;
    const PyramidBuilder builder(TestModule());
    MemorySource<float> source(600, 530, 2);
    source.FillWithNoise(9);
    source.props.noDataValues[1] = -7777;
    for (std::size_t i = 0; i < source.pixels.size(); i += 3)
        source.pixels[i] = i % 2 ? -7777.0f : std::numeric_limits<float>::quiet_NaN();
    for (std::size_t i = 0; i < 300 * 1200; ++i)
        if (i % 1200 < 400) source.pixels[i] = i % 2 ? -7777.0f : INFINITY;
    for (const Resampling method : kMethods) {
        BuildOptions options;
        options.resampling = method;
        options.overwrite = true;
        builder.Build(source, folder / "a.zmc", options);
        ExpectPyramidOf(source, folder / "a.zmc", method);
    }
}

TEST(PyramidBuilder, ReducesBytesWithNoDataValue) {
    const ScratchDirectory folder;
    MemorySource<unsigned char> source(515, 600, 3);
    source.FillWithNoise(2);
    for (const std::uint32_t band : {0u, 1u, 2u}) source.props.noDataValues[band] = 0;
    for (std::size_t i = 0; i < source.pixels.size() / 2; ++i) source.pixels[i] &= 1;
    PyramidBuilder(TestModule()).Build(source, folder / "a.zmc");
    ExpectPyramidOf(source, folder / "a.zmc", Resampling::Average);
}

TEST(PyramidBuilder, TakesNoDataValueThatTheTypeCannotHoldForNone) {
    const ScratchDirectory folder;
    MemorySource<unsigned char> source(20, 20, 1);
    std::fill(source.pixels.begin(), source.pixels.end(), static_cast<unsigned char>(241));
    source.props.noDataValues[0] = -9999;  // 241 when it is cut to a byte
    PyramidBuilder(TestModule()).Build(source, folder / "a.zmc");
    Raster raster = Raster::Open(TestModule(), folder / "a.zmc");
    EXPECT_EQ(raster.Statistics<unsigned char>(0).mean, 241);
}

TEST(PyramidBuilder, BuildsManyBandsInMortonOrder) {
    const ScratchDirectory folder;
    MemorySource<short> source(600, 300, 11);
    source.FillWithNoise(3);
    const BuildReport report = PyramidBuilder(TestModule()).Build(source, folder / "a.zmc");
    EXPECT_EQ(report.tileOrdering, zelm::TileOrder::Morton);
    ExpectPyramidOf(source, folder / "a.zmc", Resampling::Average);
}

// Alpha and masks in blocks and in noise, over samples that are no data here and there.
template <class T>
MemorySource<T> WeighedSource(std::uint32_t width, std::uint32_t height, bool masked) {
    MemorySource<T> source(width, height, 4);
    source.FillWithNoise(width);
    std::mt19937 random(height);
    source.props.noDataValues[1] = 5;
    std::vector<unsigned char> mask;
    for (std::uint32_t y = 0; y < height; ++y)
        for (std::uint32_t x = 0; x < width; ++x) {
            T* const pixel = &source.pixels[(std::size_t{y} * width + x) * 4];
            const bool noisy = (x / 50 + y / 50) % 3 == 0;
            pixel[3] = noisy ? static_cast<T>(random() % 4) : static_cast<T>(x / 64 % 2 * 120);
            if (random() % 9 == 0) pixel[1] = 5;
            if constexpr (std::is_floating_point_v<T>)
                if (random() % 7 == 0) pixel[0] = std::numeric_limits<T>::quiet_NaN();
            mask.push_back(noisy ? random() % 5 == 0 : x / 37 % 2);
        }
    source.alphas = {{0, 3}, {1, 3}};
    if (masked) source.masks = {{1, mask}, {2, mask}};
    return source;
}

template <class T>
void ExpectWeighedPyramidOf(const MemorySource<T>& source, const std::string& file,
                            Resampling method, const Weighing& weighing) {
    Raster raster = Raster::Open(TestModule(), file);
    std::vector<zelm::NoDataRule<T>> rules;
    const std::uint32_t bands = source.props.bands;
    for (std::uint32_t band = 0; band < bands; ++band)
        rules.push_back(RuleOfBand<T>(source.props, band));
    std::vector<T> expected = source.pixels;
    for (std::uint32_t level = 1; level <= raster.MaxLevel(); ++level) {
        const std::uint32_t width = raster.Width(level - 1);
        const std::uint32_t height = raster.Height(level - 1);
        std::vector<unsigned char> hidden(expected.size());
        for (std::size_t i = 0; i < hidden.size(); ++i) {
            const auto x = static_cast<std::uint32_t>(i / bands % width);
            const auto y = static_cast<std::uint32_t>(i / bands / width);
            const auto band = static_cast<std::uint32_t>(i % bands);
            if (!source.HasMask(band)) continue;
            hidden[i] = 1;
            for (std::uint32_t v = y << (level - 1); v < (y + 1) << (level - 1); ++v)
                for (std::uint32_t u = x << (level - 1); u < (x + 1) << (level - 1); ++u)
                    if (source.masks.at(band)[std::size_t{v} * source.props.samples + u] != 0)
                        hidden[i] = 0;
        }
        expected = zmctest::NaiveReduce(expected, width, height, method, rules, &weighing, hidden);
        EXPECT_TRUE(SameBytes(
            raster.Read<T>(level, {0, 0, raster.Width(level), raster.Height(level)}), expected))
            << ResamplingName(method) << " level " << level;
    }
}

// In one walk over the whole width, and in columns and several walks; by one thread and by several.
template <class T>
void ExpectWeighedLevels() {
    const ScratchDirectory folder;
    const PyramidBuilder builder(TestModule());
    for (const bool masked : {false, true}) {
        MemorySource<T> source = WeighedSource<T>(2103, 307, masked);
        Weighing weighing;
        weighing.bands.resize(4);
        for (const std::uint32_t band : {0u, 1u}) weighing.bands[band].alpha = 3;
        weighing.hidden = masked;
        for (const Resampling method : {Resampling::Average, Resampling::Mode, Resampling::Cubic}) {
            BuildOptions options;
            options.resampling = method;
            options.overwrite = true;
            const auto build = [&](const char* name, std::uint64_t memory, unsigned threads) {
                options.memory = memory;
                options.threads = threads;
                EXPECT_LE(builder.Build(source, folder / name, options).peakMemory, memory);
            };
            build("whole.zmc", std::uint64_t{256} << 20, 1);
            build("parts.zmc", std::uint64_t{14} << 20, 3);
            EXPECT_TRUE(zmctest::ReadText(folder / "whole.zmc") ==
                        zmctest::ReadText(folder / "parts.zmc"));
            ExpectWeighedPyramidOf(source, folder / "whole.zmc", method, weighing);
        }
    }
}

TEST(PyramidBuilder, AlphaAndMasksWeighEveryLevelWhateverTheMemory) {
    ExpectWeighedLevels<unsigned char>();
    if (!zmctest::IsSanitized()) ExpectWeighedLevels<float>();
}

TEST(PyramidBuilder, WeightsChangeNeitherTheFinestLevelNorStatistics) {
    const ScratchDirectory folder;
    MemorySource<unsigned char> source = WeighedSource<unsigned char>(600, 500, true);
    BuildOptions options;
    PyramidBuilder(TestModule()).Build(source, folder / "a.zmc", options);
    options.weights = false;
    PyramidBuilder(TestModule()).Build(source, folder / "b.zmc", options);
    Raster weighed = Raster::Open(TestModule(), folder / "a.zmc");
    Raster plain = Raster::Open(TestModule(), folder / "b.zmc");
    EXPECT_EQ(weighed.Read<unsigned char>(0, {0, 0, 600, 500}), source.pixels);
    for (std::uint32_t band = 0; band < 4; ++band) {
        const auto one = weighed.Statistics<unsigned char>(band);
        const auto other = plain.Statistics<unsigned char>(band);
        EXPECT_EQ(one.mean, other.mean);
        EXPECT_EQ(one.minimum, other.minimum);
    }
    EXPECT_NE(weighed.Read<unsigned char>(1, {0, 0, 300, 250}),
              plain.Read<unsigned char>(1, {0, 0, 300, 250}));
    ExpectPyramidOf(source, folder / "b.zmc", Resampling::Average);
}

// Before the band that it weighs, behind it, and not among them at all.
TEST(PyramidBuilder, AlphaIsFoundAmongTheBandsThatAreTaken) {
    const ScratchDirectory folder;
    MemorySource<short> source(4, 4, 3);
    for (std::size_t i = 0; i < 16; ++i) {
        source.pixels[3 * i] = i % 2 == 0 ? 200 : 10;
        source.pixels[3 * i + 2] = i % 2 == 0 ? 7 : 0;
    }
    source.alphas = {{0, 2}};
    BuildOptions options;
    options.overwrite = true;
    options.levels = 1;
    for (const auto& bands : std::vector<std::vector<std::uint32_t>>{{2, 0}, {0, 2}, {1, 0}}) {
        options.bands = bands;
        PyramidBuilder(TestModule()).Build(source, folder / "a.zmc", options);
        Raster raster = Raster::Open(TestModule(), folder / "a.zmc");
        const auto level = raster.Read<short>(1, {0, 0, 2, 2});
        for (std::size_t i = bands[0] == 0 ? 0 : 1; i < level.size(); i += 2)
            EXPECT_EQ(level[i], 200);
    }
}

TEST(PyramidBuilder, AnAlphaBandThatThereIsNotIsRefused) {
    const ScratchDirectory folder;
    MemorySource<short> source(4, 4, 3);
    source.alphas = {{0, 3}};
    EXPECT_THAT(
        zmctest::FailureOf([&] { PyramidBuilder(TestModule()).Build(source, folder / "a.zmc"); }),
        testing::HasSubstr("cannot take band 3, counted from 0, for alpha: there are 3"));
    EXPECT_FALSE(std::filesystem::exists(folder / "a.zmc"));
}

TEST(PyramidBuilder, ABandIsNotItsOwnAlphaAndComplexTypesHaveNone) {
    const ScratchDirectory folder;
    MemorySource<unsigned char> plain(300, 300, 2);
    plain.FillWithNoise(3);
    plain.alphas = {{1, 1}};
    PyramidBuilder(TestModule()).Build(plain, folder / "a.zmc");
    ExpectPyramidOf(plain, folder / "a.zmc", Resampling::Average);
    MemorySource<zelm::Complex<float>> complex(300, 300, 2);
    complex.FillWithNoise(4);
    complex.alphas = {{0, 1}};
    complex.palettes[0] = zmctest::PaletteOf({{1, 2, 3, 255}});
    BuildOptions options;
    options.overwrite = true;
    options.resampling = Resampling::Average;
    PyramidBuilder(TestModule()).Build(complex, folder / "a.zmc", options);
    ExpectPyramidOf(complex, folder / "a.zmc", Resampling::Average);
}

TEST(PyramidBuilder, PalettesAreAveragedAsColours) {
    const ScratchDirectory folder;
    MemorySource<unsigned char> source(512, 512, 1);
    // Black and white alternate; grey is entry 9, and 200 has no colour.
    std::vector<std::array<std::uint8_t, 4>> colors(10, {255, 0, 0, 255});
    colors[0] = {0, 0, 0, 255};
    colors[1] = {255, 255, 255, 255};
    colors[9] = {128, 128, 128, 255};
    source.palettes[0] = zmctest::PaletteOf(colors);
    for (std::size_t i = 0; i < source.pixels.size(); ++i)
        source.pixels[i] = i < 4096 ? 200 : static_cast<unsigned char>(i % 2);
    BuildOptions options;
    options.resampling = Resampling::Average;
    options.overwrite = true;
    PyramidBuilder(TestModule()).Build(source, folder / "a.zmc", options);
    Raster raster = Raster::Open(TestModule(), folder / "a.zmc");
    const auto level = raster.Read<unsigned char>(1, {0, 0, 256, 256});
    EXPECT_EQ(level.front(), 200);
    EXPECT_EQ(level.back(), 9);
    // Without colours the indices are quantities.
    source.palettes[0] = zelm::PalettePtr(new zelm::Palette);
    PyramidBuilder(TestModule()).Build(source, folder / "a.zmc", options);
    ExpectPyramidOf(source, folder / "a.zmc", Resampling::Average);
}

TEST(PyramidBuilder, BuildsRastersOfEveryShape) {
    const ScratchDirectory folder;
    const PyramidBuilder builder(TestModule());
    for (const auto& [width, height] : std::vector<std::pair<std::uint32_t, std::uint32_t>>{
             {1, 1}, {1, 2000}, {2000, 1}, {2, 3}, {255, 257}, {256, 256}, {257, 512}, {1025, 3}}) {
        MemorySource<unsigned short> source(width, height, 1);
        source.FillWithNoise(width + height);
        for (const Resampling method : {Resampling::Average, Resampling::Lanczos}) {
            BuildOptions options;
            options.overwrite = true;
            options.resampling = method;
            builder.Build(source, folder / "a.zmc", options);
            ExpectPyramidOf(source, folder / "a.zmc", method);
        }
    }
}

TEST(PyramidBuilder, WalksInColumnsWhereTheBudgetIsSmall) {
    const ScratchDirectory folder;
    const PyramidBuilder builder(TestModule());
    MemorySource<double> source(5003, 700, 1);
    source.FillWithNoise(4);
    source.pixels[5000] = std::numeric_limits<double>::quiet_NaN();
    for (const Resampling method : kMethods) {
        BuildOptions options;
        options.resampling = method;
        options.overwrite = true;
        options.threads = 2;
        options.memory = std::uint64_t{9} << 20;  // the whole width takes 45 MiB
        source.read = 0;
        const BuildReport report = builder.Build(source, folder / "a.zmc", options);
        EXPECT_LE(report.peakMemory, options.memory) << ResamplingName(method);
        EXPECT_LE(source.read, source.pixels.size() * 5 / 4) << ResamplingName(method);
        ExpectPyramidOf(source, folder / "a.zmc", method);
    }
}

TEST(PyramidBuilder, StaysWithinTheBudgetWhateverTheWidth) {
    const ScratchDirectory folder;
    const PyramidBuilder builder(TestModule());
    for (const std::uint32_t width : {1000u, 8000u, 32000u}) {
        MemorySource<unsigned char> source(width, 300, 3);
        source.FillWithNoise(width);
        BuildOptions options;
        options.overwrite = true;
        options.memory = std::uint64_t{16} << 20;
        const BuildReport report = builder.Build(source, folder / "a.zmc", options);
        EXPECT_LE(report.peakMemory, options.memory) << width;
    }
}

TEST(PyramidBuilder, RefusesBudgetThatIsTooSmallAndTellsTheLeast) {
    const ScratchDirectory folder;
    MemorySource<double> source(3000, 300, 1);
    BuildOptions options;
    options.memory = 100000;
    try {
        PyramidBuilder(TestModule()).Build(source, folder / "a.zmc", options);
        FAIL();
    } catch (const Error& error) {
        EXPECT_THAT(error.what(), testing::HasSubstr("it needs at least "));
    }
}

TEST(PyramidBuilder, GivesTheSameFileOnAnyNumberOfThreads) {
    const ScratchDirectory folder;
    const PyramidBuilder builder(TestModule());
    MemorySource<float> source(1500, 900, 2);
    source.FillWithNoise(6);
    std::string first;
    for (const std::uint32_t threads : {1u, 2u, 4u}) {
        BuildOptions options;
        options.threads = threads;
        options.overwrite = true;
        options.resampling = Resampling::Cubic;
        builder.Build(source, folder / "a.zmc", options);
        const std::string bytes = zmctest::ReadText(folder / "a.zmc");
        if (first.empty()) first = bytes;
        EXPECT_EQ(bytes == first, true) << threads;
    }
}

TEST(PyramidBuilder, ReadsTheSourceOnceInWholeLines) {
    const ScratchDirectory folder;
    MemorySource<unsigned char> source(900, 700, 1);
    std::uint32_t next = 0;
    source.beforeRead = [&](const Window& window) {
        EXPECT_EQ(window.x, 0u);
        EXPECT_EQ(window.width, 900u);
        EXPECT_EQ(window.y, next);
        next = window.y + window.height;
    };
    PyramidBuilder(TestModule()).Build(source, folder / "a.zmc");
    EXPECT_EQ(next, 700u);
}

template <class T>
void ExpectStatistics() {
    const ScratchDirectory folder;
    MemorySource<T> source(300, 280, 2);
    source.FillWithNoise(8);
    PyramidBuilder(TestModule()).Build(source, folder / "a.zmc");
    Raster raster = Raster::Open(TestModule(), folder / "a.zmc");
    EXPECT_EQ(raster.HasStatistics(0), !zelm::kIsComplex<T>) << zelm::ElementTraits<T>::word;
    if constexpr (!zelm::kIsComplex<T>) {
        const auto histograms = raster.Histograms<T>();
        ASSERT_EQ(histograms.size(), 2u);
        for (std::uint32_t band = 0; band < 2; ++band) {
            BandAccumulator<T> model;
            model.AddRow(source.pixels.data(), nullptr, band, 2, 300 * 280);
            const auto expected = model.Stats(band);
            const auto stored = raster.Statistics<T>(band);
            EXPECT_EQ(stored.flags, 127u) << zelm::ElementTraits<T>::word << expected.flags;
            EXPECT_NEAR(stored.mean, expected.mean, std::abs(expected.mean) * 1e-5);
            EXPECT_NEAR(stored.standardDeviation, expected.standardDeviation,
                        expected.standardDeviation * 1e-5);
            EXPECT_EQ(histograms[band].binCount, 256u);
            std::uint64_t total = 0;
            for (std::uint32_t bin = 0; bin < 256; ++bin)
                total += histograms[band].counts.data[bin];
            EXPECT_EQ(total, 300u * 280u);
        }
    }
}

TEST(PyramidBuilder, StoresStatisticsAndHistogramsOfEveryType) {
#define ZMC_X(type, name, code) ExpectStatistics<type>();
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
}

TEST(PyramidBuilder, TakesTheUsualNumberOfBinsUnlessToldOtherwise) {
    EXPECT_EQ(BuildOptions().bins, kDefaultHistogramBins);
}

TEST(PyramidBuilder, MoreThreadsThanThereCanBeAreTakenForTheMost) {
    const ScratchDirectory folder;
    MemorySource<unsigned char> source(300, 300, 1);
    BuildOptions options;
    for (const std::uint32_t threads : {0x7FFFFFFFu, 0x80000000u, 0xFFFFFFFFu}) {
        options.threads = threads;
        options.overwrite = true;
        const auto report = PyramidBuilder(TestModule()).Build(source, folder / "a.pyr", options);
        EXPECT_EQ(report.maxLevel, 1u);
    }
}

TEST(PyramidBuilder, ChecksOptionsWithoutTouchingAnything) {
    const ScratchDirectory folder;
    MemorySource<unsigned char> source(300, 300, 1);
    BuildOptions options;
    const PyramidBuilder builder(TestModule());
    builder.Check(source, folder / "a.pyr", options);
    options.levels = 9;
    EXPECT_THROW(builder.Check(source, folder / "a.pyr", options), Error);
    EXPECT_TRUE(std::filesystem::is_empty(folder.String()));
}

TEST(PyramidBuilder, StoresNoStatisticsWhenAskedSo) {
    const ScratchDirectory folder;
    MemorySource<float> source(30, 20, 1);
    BuildOptions options;
    options.statistics = false;
    PyramidBuilder(TestModule()).Build(source, folder / "a.zmc", options);
    EXPECT_FALSE(Raster::Open(TestModule(), folder / "a.zmc").HasStatistics(0));
}

TEST(PyramidBuilder, StoresPalettesAndThenReducesByMode) {
    const ScratchDirectory folder;
    MemorySource<unsigned char> source(600, 600, 1);
    source.FillWithNoise(1);
    zelm::PalettePtr palette(new zelm::Palette);
    unsigned char components[] = {10, 20, 30, 255};
    palette->AddColor(zelm::RGBAColor(zelm::Array<unsigned char>(components, zelm::ArrayShape(4))));
    source.palettes.emplace(0, palette);
    const BuildReport report = PyramidBuilder(TestModule()).Build(source, folder / "a.zmc");
    EXPECT_EQ(report.resampling, Resampling::Mode);
    ExpectPyramidOf(source, folder / "a.zmc", Resampling::Mode);
    const zelm::PalettePtr stored = Raster::Open(TestModule(), folder / "a.zmc").BandPalette(0);
    ASSERT_TRUE(stored);
    EXPECT_EQ(stored->GetColor(0)->green, 20);
}

// Bands may share their colours where they come from, and do not in a pyramid.
TEST(PyramidBuilder, MoreColoursThanAFileMayHaveAreRefusedAtOnce) {
    const ScratchDirectory folder;
    MemorySource<unsigned char> source(40, 30, 17);
    const zelm::PalettePtr palette(new zelm::Palette);
    for (int i = 0; i < 65536; ++i) palette->AddColor(zelm::Color());
    for (std::uint32_t band = 0; band < 17; ++band) source.palettes.emplace(band, palette);
    EXPECT_EQ(
        zmctest::FailureOf([&] { PyramidBuilder(TestModule()).Build(source, folder / "a.zmc"); }),
        "memory: cannot take its palettes: they have more colours than a pyramid file may, "
        "1048576");
    EXPECT_EQ(source.read, 0u);
    EXPECT_TRUE(std::filesystem::is_empty(folder.String()));
}

TEST(PyramidBuilder, TakesBandsInTheOrderAskedFor) {
    const ScratchDirectory folder;
    MemorySource<unsigned char> source(40, 30, 3);
    source.FillWithNoise(1);
    source.props.noDataValues[2] = 5;
    BuildOptions options;
    options.bands = {2, 0};
    PyramidBuilder(TestModule()).Build(source, folder / "a.zmc", options);
    Raster raster = Raster::Open(TestModule(), folder / "a.zmc");
    const auto pixels = raster.Read<unsigned char>(0, {0, 0, 40, 30});
    EXPECT_EQ(pixels[0], source.pixels[2]);
    EXPECT_EQ(pixels[1], source.pixels[0]);
    options.bands = {3};
    options.overwrite = true;
    EXPECT_THROW(PyramidBuilder(TestModule()).Build(source, folder / "a.zmc", options), Error);
}

TEST(PyramidBuilder, LevelsEndWhereTheRasterDoes) {
    const ScratchDirectory folder;
    const PyramidBuilder builder(TestModule());
    MemorySource<unsigned char> source(1000, 777, 1);
    BuildOptions options;
    EXPECT_EQ(builder.Build(source, folder / "auto.zmc", options).maxLevel, 2u);
    options.levels = 0;
    EXPECT_EQ(builder.Build(source, folder / "none.zmc", options).maxLevel, 0u);
    options.levels = 9;
    EXPECT_EQ(builder.Build(source, folder / "most.zmc", options).maxLevel, 9u);
    ExpectPyramidOf(source, folder / "most.zmc", Resampling::Average);
    options.levels = 10;
    EXPECT_THROW(builder.Build(source, folder / "more.zmc", options), Error);
    MemorySource<unsigned char> many(600, 600, 9);
    options.levels = 9;
    EXPECT_THROW(builder.Build(many, folder / "morton.zmc", options), Error);
}

TEST(PyramidBuilder, OrderingIsWhatTheBandsAllow) {
    const ScratchDirectory folder;
    const PyramidBuilder builder(TestModule());
    MemorySource<unsigned char> few(30, 30, 3);
    MemorySource<unsigned char> many(30, 30, 9);
    BuildOptions options;
    options.ordering = Ordering::Scanline;
    EXPECT_EQ(builder.Build(few, folder / "a.zmc", options).tileOrdering,
              zelm::TileOrder::Scanline);
    EXPECT_THROW(builder.Build(many, folder / "b.zmc", options), Error);
    options.ordering = Ordering::Blocked;
    EXPECT_EQ(builder.Build(few, folder / "c.zmc", options).tileOrdering, zelm::TileOrder::Blocked);
    options.ordering = Ordering::Morton;
    EXPECT_EQ(builder.Build(many, folder / "d.zmc", options).tileOrdering, zelm::TileOrder::Morton);
    EXPECT_THROW(builder.Build(few, folder / "e.zmc", options), Error);
}

TEST(PyramidBuilder, RefusesMethodsThatTheTypeHasNot) {
    const ScratchDirectory folder;
    MemorySource<zelm::Complex<float>> source(30, 30, 1);
    BuildOptions options;
    options.resampling = Resampling::Median;
    EXPECT_THROW(PyramidBuilder(TestModule()).Build(source, folder / "a.zmc", options), Error);
}

}  // namespace
}  // namespace zmchost
