// Which level a picture of a window is made of, and that strips make the same picture as one block.
#include <gtest/gtest.h>

#include <cmath>
#include <numeric>
#include <random>
#include <vector>

#include "host/base/Error.h"
#include "render/Resize.h"
#include "tests/render/MemoryPixels.h"

namespace zmcrender {
namespace {

using zmctest::MemoryPixels;
using zmctest::Styled;

using Levels = std::vector<std::uint32_t>;

// Levels that are flat: as bright as their number.
MemoryPixels<unsigned char> Flat(std::uint32_t width, std::uint32_t height, std::uint32_t levels) {
    MemoryPixels<unsigned char> source(width, height, 1, {});
    source.levels.clear();
    for (std::uint32_t level = 0; level < levels; ++level)
        source.levels.push_back(
            {width >> level,
             height >> level,
             std::vector<unsigned char>(std::size_t{width >> level} * (height >> level),
                                        static_cast<unsigned char>(level)),
             {}});
    return source;
}

TEST(RenderWindow, TheCoarsestLevelThatIsStillAsFineIsRead) {
    auto source = Flat(256, 128, 4);
    const zmchost::Window all{0, 0, 256, 128};
    EXPECT_EQ(LevelFor(source, all, 256, 128), 0u);
    EXPECT_EQ(LevelFor(source, all, 512, 256), 0u);
    EXPECT_EQ(LevelFor(source, all, 129, 64), 0u);
    EXPECT_EQ(LevelFor(source, all, 128, 64), 1u);
    EXPECT_EQ(LevelFor(source, all, 64, 64), 1u);
    EXPECT_EQ(LevelFor(source, all, 33, 16), 2u);
    EXPECT_EQ(LevelFor(source, all, 32, 16), 3u);
    EXPECT_EQ(LevelFor(source, all, 1, 1), 3u);
    EXPECT_EQ(LevelFor(source, {64, 64, 64, 32}, 32, 16), 1u);
    const Renderer renderer(source.Facts(), Styled({{"stretch", "none"}}), source);
    source.readLevels.clear();
    EXPECT_EQ(RenderWindow(renderer, source, all, 40, 20).bytes,
              std::vector<unsigned char>(800, 2));
    EXPECT_EQ(source.readLevels, (Levels{2}));
}

TEST(RenderWindow, LevelsThatHaveShrunkToNothingAreNotRead) {
    auto source = Flat(8, 2, 4);
    EXPECT_EQ(LevelFor(source, {0, 0, 8, 2}, 1, 1), 1u);
}

TEST(RenderWindow, AWindowInItsOwnSizeIsWhatTheLevelHas) {
    std::mt19937_64 random(1);
    std::vector<unsigned char> samples(40 * 30 * 3);
    for (auto& sample : samples) sample = static_cast<unsigned char>(random());
    MemoryPixels<unsigned char> source(40, 30, 3, samples);
    const Renderer renderer(source.Facts(), {}, source);
    const Picture picture = RenderWindow(renderer, source, {5, 7, 20, 11}, 20, 11);
    for (std::size_t y = 0; y < 11; ++y)
        for (std::size_t x = 0; x < 60; ++x)
            ASSERT_EQ(picture.bytes[y * 60 + x], samples[(y + 7) * 120 + 15 + x]);
}

TEST(RenderWindow, AWindowOfAnyPlaceIsThePartOfTheWhole) {
    std::mt19937_64 random(2);
    std::vector<unsigned char> samples(64 * 48);
    for (auto& sample : samples) sample = static_cast<unsigned char>(random());
    MemoryPixels<unsigned char> source(64, 48, 1, samples);
    const Renderer renderer(source.Facts(), Styled({{"stretch", "none"}}), source);
    const Picture whole{64, 48, 1, 8, samples};
    EXPECT_EQ(RenderWindow(renderer, source, {3, 5, 50, 40}, 17, 9).bytes,
              Resize(whole, {3, 5, 50, 40}, 17, 9).bytes);
    // What lies around a window lends its colours where the picture grows.
    EXPECT_EQ(RenderWindow(renderer, source, {3, 5, 8, 4}, 40, 30).bytes,
              Resize(whole, {3, 5, 8, 4}, 40, 30).bytes);
}

TEST(RenderWindow, EdgesOfWindowsMayLieBetweenThePixelsOfALevel) {
    MemoryPixels<unsigned char> source(8, 2, 1, std::vector<unsigned char>(16, 0));
    source.levels.push_back({4, 1, {0, 80, 160, 240}, {}});
    const Renderer renderer(source.Facts(), Styled({{"stretch", "none"}}), source);
    // Level 0's columns 1 to 6 are level 1's from 0.5 to 3.5: two halves at the ends.
    EXPECT_EQ(RenderWindow(renderer, source, {1, 0, 6, 2}, 1, 1).bytes,
              (std::vector<unsigned char>{120}));
    EXPECT_EQ(RenderWindow(renderer, source, {1, 0, 6, 2}, 3, 1).bytes,
              (std::vector<unsigned char>{40, 120, 200}));
}

TEST(RenderWindow, AScaleHasThePixelsOfItsLevelAndTheNearestOnesBeyondIt) {
    auto source = Flat(7, 5, 2);
    source.levels[1].samples = {10, 20, 30, 40, 50, 60};
    const Renderer renderer(source.Facts(), Styled({{"stretch", "none"}}), source);
    EXPECT_EQ(ExtentInScale(7, 1), 4u);
    EXPECT_EQ(ExtentInScale(0xffffffffu, 32), 1u);
    EXPECT_EQ(RenderInScale(renderer, source, 1, {0, 0, 4, 3}).bytes,
              (std::vector<unsigned char>{10, 20, 30, 30, 40, 50, 60, 60, 40, 50, 60, 60}));
    EXPECT_EQ(RenderInScale(renderer, source, 1, {1, 0, 2, 2}).bytes,
              (std::vector<unsigned char>{20, 30, 50, 60}));
    // The column that the level lacks, alone.
    EXPECT_EQ(RenderInScale(renderer, source, 1, {3, 0, 1, 3}).bytes,
              (std::vector<unsigned char>{30, 60, 60}));
    // Scales beyond the levels, down to a pixel, are made of the coarsest.
    source.readLevels.clear();
    EXPECT_EQ(RenderInScale(renderer, source, 2, {0, 0, 2, 2}).bytes,
              (std::vector<unsigned char>{30, 45, 45, 60}));
    EXPECT_EQ(RenderInScale(renderer, source, 3, {0, 0, 1, 1}).bytes,
              (std::vector<unsigned char>{35}));
    EXPECT_EQ(RenderInScale(renderer, source, 32, {0, 0, 1, 1}).bytes,
              (std::vector<unsigned char>{35}));
    EXPECT_EQ(source.readLevels, (Levels{1, 1, 1}));
}

// 96 MiB of samples, of which no more than a third may be held at once.
TEST(RenderWindow, ALevelThatIsTooLargeIsReadInStrips) {
    constexpr std::uint32_t kWidth = 4096, kHeight = 3072;
    std::vector<double> samples(std::size_t{kWidth} * kHeight);
    for (std::size_t i = 0; i < samples.size(); ++i)
        samples[i] = static_cast<double>(i / kWidth / 12);
    MemoryPixels<double> source(kWidth, kHeight, 1, std::move(samples));
    const Renderer renderer(source.Facts(), Styled({{"stretch", "0,255"}}), source);
    const Picture picture = RenderWindow(renderer, source, WholeOf(source), 1, 256);
    std::vector<unsigned char> lines(256);
    std::iota(lines.begin(), lines.end(), static_cast<unsigned char>(0));
    EXPECT_EQ(picture.bytes, lines);
    EXPECT_GE(source.readLevels.size(), 3u);
    EXPECT_LE(source.mostRead * sizeof(double), std::uint64_t{32} << 20);
}

// Its records tell nothing, and there is no coarse level: a million of its samples have to do.
TEST(RenderWindow, OfALargeLevelSomeWindowsTellTheBounds) {
    constexpr std::uint32_t kWidth = 2000, kHeight = 1500;
    std::vector<float> samples(std::size_t{kWidth} * kHeight);
    for (std::size_t i = 0; i < samples.size(); ++i)
        samples[i] = static_cast<float>(i % kWidth + i / kWidth);
    MemoryPixels<float> source(kWidth, kHeight, 1, std::move(samples));
    const Renderer renderer(source.Facts(), {}, source);
    EXPECT_EQ(source.readLevels.size(), 64u);
    EXPECT_LE(source.mostRead, 128u * 128u);
    EXPECT_EQ(renderer.Bounds()[0], (Range{Number(0), Number(kWidth + kHeight - 2)}))
        << "its corners are among them";
}

TEST(RenderWindow, StripsOfLitHeightsHaveNoSeams) {
    constexpr std::uint32_t kWidth = 2048, kHeight = 2500;
    std::vector<double> samples(std::size_t{kWidth} * kHeight);
    for (std::size_t i = 0; i < samples.size(); ++i)
        samples[i] = std::sin(static_cast<double>(i % kWidth) / 40) * 9 +
                     static_cast<double>(i / kWidth % 97) / 7;
    MemoryPixels<double> source(kWidth, kHeight, 1, samples);
    const Renderer renderer(source.Facts(), Styled({{"hillshade", "1"}, {"zfactor", "1"}}), source);
    source.readLevels.clear();
    const Picture strips = RenderWindow(renderer, source, WholeOf(source), 50, kHeight / 2);
    EXPECT_GE(source.readLevels.size(), 2u);
    std::vector<double> padded;
    for (std::uint32_t y = 0; y < kHeight + 2; ++y)
        for (std::uint32_t x = 0; x < kWidth + 2; ++x) {
            const std::size_t row = std::clamp<std::size_t>(y, 1, kHeight) - 1;
            padded.push_back(samples[row * kWidth + std::clamp<std::size_t>(x, 1, kWidth) - 1]);
        }
    const Picture whole =
        renderer.Render({.data = padded.data(), .width = kWidth, .height = kHeight, .halo = 1});
    EXPECT_EQ(strips.bytes, Resize(whole, 50, kHeight / 2).bytes);
}

TEST(RenderWindow, HiddenPixelsLendNoColour) {
    MemoryPixels<unsigned char> source(4, 1, 1, {200, 0, 100, 0});
    source.levels[0].mask = {255, 0, 255, 255};
    const Renderer renderer(source.Facts(), Styled({{"stretch", "none"}}), source);
    EXPECT_EQ(RenderWindow(renderer, source, {0, 0, 4, 1}, 2, 1).bytes,
              (std::vector<unsigned char>{200, 128, 50, 255}));
}

// A source that has no samples, only a size.
struct Endless final : PixelSource {
    std::string Name() const override { return "endless"; }
    std::uint32_t PixelType() const override { return zelm::PixelTypeCode::Double; }
    std::uint32_t Bands() const override { return 1; }
    std::uint32_t MinLevel() const override { return 0; }
    std::uint32_t MaxLevel() const override { return 0; }
    std::uint32_t Width(std::uint32_t) const override { return 4000000000u; }
    std::uint32_t Height(std::uint32_t) const override { return 2; }
    std::uint32_t TileSide() const override { return 256; }
    void Read(std::uint32_t, const zmchost::Window&, std::span<const std::uint32_t>,
              void*) override {
        ADD_FAILURE() << "nothing is to be read";
    }
};

TEST(RenderWindow, ALineThatTakesTooMuchMemoryIsRefused) {
    Endless source;
    const RasterFacts facts{"endless", source.PixelType(), std::vector<BandFacts>(1)};
    const Renderer renderer(facts, Styled({{"stretch", "0,1"}}), source);
    try {
        static_cast<void>(RenderWindow(renderer, source, WholeOf(source), 100, 1));
        FAIL() << "it was read";
    } catch (const zmchost::Error& error) {
        EXPECT_STREQ(error.what(),
                     "endless: cannot make a picture of so wide a window: a line of it takes more "
                     "than 256 MiB, and there is no level that is coarse enough");
    }
}

}  // namespace
}  // namespace zmcrender
