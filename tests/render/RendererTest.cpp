// What a style comes to for a raster: bands, bounds, palettes, masks, and what does not go
// together.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <thread>
#include <vector>

#include "render/Colormaps.h"
#include "tests/render/MemoryPixels.h"

namespace zmcrender {
namespace {

using zmctest::MemoryPixels;
using zmctest::Rendered;
using zmctest::Styled;
using Bytes = std::vector<unsigned char>;
using Pairs = std::vector<std::pair<std::string, std::string>>;

template <class T>
std::vector<Range> BoundsOf(MemoryPixels<T>& source, const RasterFacts& facts, const Pairs& pairs) {
    const Renderer renderer(facts, Styled(pairs), source);
    return {renderer.Bounds().begin(), renderer.Bounds().end()};
}

template <class T>
std::string Refusal(MemoryPixels<T>& source, const RasterFacts& facts, const Pairs& pairs) {
    try {
        const Renderer renderer(facts, Styled(pairs), source);
    } catch (const StyleError& error) {
        return error.what();
    }
    return "taken";
}

std::vector<Range> One(Number minimum, Number maximum) { return {{minimum, maximum}}; }

MemoryPixels<unsigned char> Bytewise(std::uint32_t bands) {
    Bytes samples;
    for (unsigned i = 0; i < 4 * bands; ++i)
        samples.push_back(static_cast<unsigned char>(10 * i + 1));
    return {2, 2, bands, samples};
}

TEST(Renderer, BytesAreShownAsTheyAre) {
    auto source = Bytewise(3);
    const Picture picture = Rendered(source, source.Facts(), {});
    EXPECT_EQ(picture.channels, 3u);
    EXPECT_EQ(picture.bytes, source.levels[0].samples);
}

TEST(Renderer, ASingleBandOfBytesIsStretchedAsOtherTypesAre) {
    auto source = Bytewise(3);
    RasterFacts facts = source.Facts();
    EXPECT_EQ(BoundsOf(source, facts, {{"bands", "2"}}), One(Number(11), Number(101)));
    facts.bands[1].histogram =
        HistogramFacts{Number(0), Number(99), 1, std::vector<std::uint64_t>(100, 10)};
    EXPECT_EQ(BoundsOf(source, facts, {{"bands", "2"}}), One(Number(1), Number(97)));
    EXPECT_EQ(BoundsOf(source, facts, {{"bands", "2"}, {"colormap", "viridis"}}),
              One(Number(1), Number(97)));
    // With a band of alpha it is single all the same.
    EXPECT_EQ(BoundsOf(source, facts, {{"bands", "2,3"}}), One(Number(1), Number(97)));
    EXPECT_EQ(BoundsOf(source, facts, {{"bands", "2"}, {"stretch", "none"}}),
              One(Number(0), Number(255)));
    EXPECT_EQ(BoundsOf(source, facts, {})[1], (Range{Number(0), Number(255)}));
}

TEST(Renderer, SamplesThatAreThePictureAlreadyAreTold) {
    auto source = Bytewise(3);
    const Bytes bytes = source.levels[0].samples;
    const unsigned char shown[] = {0, 1, 1, 1};
    const Samples samples{.data = bytes.data(), .width = 2, .height = 2};
    const auto isCopy = [&](const Pairs& style, const Samples& of) {
        return Renderer(source.Facts(), Styled(style), source).IsCopy(of);
    };
    EXPECT_TRUE(isCopy({}, samples));
    EXPECT_EQ(Renderer(source.Facts(), {}, source).Render(samples).bytes, bytes);
    EXPECT_TRUE(isCopy({{"bands", "1"}, {"stretch", "none"}}, samples));
    EXPECT_FALSE(isCopy({}, {.data = bytes.data(), .width = 2, .height = 2, .shown = shown}));
    EXPECT_FALSE(isCopy({}, {.data = bytes.data(), .width = 2, .height = 2, .planar = true}));
    EXPECT_FALSE(isCopy({}, {.data = bytes.data(), .width = 1, .height = 1, .halo = 1}));
    const Pairs others = {{"stretch", "0,100"},  {"gamma", "2"},    {"depth", "16"},
                          {"colormap", "turbo"}, {"nodata", "11"},  {"expression", "b1"},
                          {"bands", "1,2"},      {"bands", "1,1,2"}};
    for (const auto& style : others) EXPECT_FALSE(isCopy({style}, samples)) << style.first;
}

TEST(Renderer, TheFirstThreeOfManyBandsAreColours) {
    auto source = Bytewise(5);
    EXPECT_EQ(Rendered(source, source.Facts(), {}).bytes,
              (Bytes{1, 11, 21, 51, 61, 71, 101, 111, 121, 151, 161, 171}));
}

TEST(Renderer, BandsComeInTheOrderOfTheStyleAndAreReadOnce) {
    auto source = Bytewise(4);
    const Renderer renderer(source.Facts(), Styled({{"bands", "3,1,3"}}), source);
    EXPECT_EQ(Bytes(renderer.Bands().begin(), renderer.Bands().end()), (Bytes{2, 0}));
    EXPECT_EQ(RenderWindow(renderer, source, {0, 0, 2, 1}, 2, 1).bytes,
              (Bytes{21, 1, 21, 61, 41, 61}));
}

TEST(Renderer, AFourthBandIsAlphaAndASecondIsOfGrey) {
    MemoryPixels<unsigned char> source(2, 1, 4, {1, 2, 3, 255, 5, 6, 7, 8});
    EXPECT_EQ(Rendered(source, source.Facts(), Styled({{"bands", "1,2,3,4"}})).bytes,
              (Bytes{1, 2, 3, 255, 5, 6, 7, 8}));
    EXPECT_EQ(
        Rendered(source, source.Facts(), Styled({{"bands", "2,4"}, {"stretch", "none"}})).bytes,
        (Bytes{2, 255, 6, 8}));
}

TEST(Renderer, AnOpaqueAlphaBandLeavesNoAlpha) {
    MemoryPixels<unsigned char> source(1, 2, 2, {1, 255, 2, 255});
    EXPECT_EQ(
        Rendered(source, source.Facts(), Styled({{"bands", "1,2"}, {"stretch", "none"}})).bytes,
        (Bytes{1, 2}));
}

TEST(Renderer, AlphaOfOtherTypesFillsTheirRangeUnlessAPairIsGiven) {
    MemoryPixels<unsigned short> wide(3, 1, 2, {9, 0, 9, 32768, 9, 65535});
    EXPECT_EQ(Rendered(wide, wide.Facts(), Styled({{"bands", "1,2"}, {"stretch", "0,9"}})).bytes,
              (Bytes{255, 0, 255, 128, 255, 255}));
    EXPECT_EQ(
        Rendered(wide, wide.Facts(), Styled({{"bands", "1,2"}, {"stretch", "0,9;0,32768"}})).bytes,
        (Bytes{255, 0, 255, 255, 255, 255}));
    MemoryPixels<float> real(2, 1, 2, {9, 0.5f, 9, 1});
    EXPECT_EQ(Rendered(real, real.Facts(), Styled({{"bands", "1,2"}, {"stretch", "0,9"}})).bytes,
              (Bytes{255, 128, 255, 255}));
}

TEST(Renderer, SixteenBitsKeepAlphaInSixteen) {
    MemoryPixels<unsigned short> source(1, 1, 2, {1000, 40000});
    const Picture picture = Rendered(
        source, source.Facts(), Styled({{"bands", "1,2"}, {"stretch", "none"}, {"depth", "16"}}));
    ASSERT_EQ(picture.bytes.size(), 4u);
    EXPECT_EQ(picture.bytes[0] + 256 * picture.bytes[1], 1000);
    EXPECT_EQ(picture.bytes[2] + 256 * picture.bytes[3], 40000);
}

TEST(Renderer, APixelIsTransparentWhereAllItsColoursAreMissing) {
    MemoryPixels<unsigned char> source(3, 1, 3, {0, 0, 0, 0, 9, 9, 7, 7, 7});
    RasterFacts facts = source.Facts();
    for (BandFacts& band : facts.bands) band.noData = Number(0);
    EXPECT_EQ(Rendered(source, facts, {}).bytes, (Bytes{0, 0, 0, 0, 0, 9, 9, 255, 7, 7, 7, 255}));
    EXPECT_EQ(Rendered(source, facts, Styled({{"nodata", "none"}})).bytes,
              source.levels[0].samples);
    EXPECT_EQ(Rendered(source, source.Facts(), Styled({{"nodata", "7"}})).bytes,
              (Bytes{0, 0, 0, 255, 0, 9, 9, 255, 0, 0, 0, 0}));
}

TEST(Renderer, ANoDataValueThatTheTypeCannotHoldMarksNothing) {
    auto source = Bytewise(1);
    EXPECT_EQ(Rendered(source, source.Facts(), Styled({{"nodata", "-9999"}})).channels, 1u);
    EXPECT_EQ(Rendered(source, source.Facts(), Styled({{"nodata", "257"}})).channels, 1u);
    EXPECT_EQ(Rendered(source, source.Facts(), Styled({{"nodata", "1.5"}})).channels, 1u);
}

TEST(Renderer, NoDataOfSixtyFourBitsIsExact) {
    constexpr std::uint64_t big = (std::uint64_t{1} << 60) + 1;
    MemoryPixels<std::uint64_t> source(2, 1, 1, {big, big - 1});
    RasterFacts facts = source.Facts();
    facts.bands[0].noData = Number(big);
    EXPECT_EQ(Rendered(source, facts, Styled({{"stretch", "0,9"}})).bytes, (Bytes{0, 0, 255, 255}));
}

TEST(Renderer, AMaskHides) {
    auto source = Bytewise(3);
    source.levels[0].mask = {255, 0, 1, 0};
    const Picture picture = Rendered(source, source.Facts(), {});
    ASSERT_EQ(picture.channels, 4u);
    EXPECT_EQ((Bytes{picture.bytes[3], picture.bytes[7], picture.bytes[11], picture.bytes[15]}),
              (Bytes{255, 0, 255, 0}));
    const Renderer renderer(source.Facts(), Styled({{"bands", "1"}, {"stretch", "none"}}), source);
    const unsigned char shown[] = {0, 9};
    const Samples samples{.data = "ab", .width = 2, .height = 1, .shown = shown};
    EXPECT_EQ(renderer.Render(samples).bytes, (Bytes{'a', 0, 'b', 255}));
}

TEST(Renderer, APaletteIsShownUnlessAStretchOrAnotherMapIsAskedFor) {
    MemoryPixels<unsigned char> source(4, 1, 1, {0, 1, 2, 3});
    RasterFacts facts = source.Facts();
    facts.bands[0].palette = {{10, 20, 30, 255}, {40, 50, 60, 255}, {70, 80, 90, 128}};
    const Bytes coloured{10, 20, 30, 255, 40, 50, 60, 255, 70, 80, 90, 128, 0, 0, 0, 0};
    EXPECT_EQ(Rendered(source, facts, {}).bytes, coloured);
    EXPECT_EQ(Rendered(source, facts, Styled({{"colormap", "palette"}, {"stretch", "0,9"}})).bytes,
              coloured);
    EXPECT_EQ(Rendered(source, facts, Styled({{"stretch", "none"}})).bytes, (Bytes{0, 1, 2, 3}));
    EXPECT_EQ(Rendered(source, facts, Styled({{"colormap", "grey"}})).channels, 3u);
    facts.bands[0].noData = Number(1);
    EXPECT_EQ(Rendered(source, facts, {}).bytes[7], 0);
}

TEST(Renderer, APaletteThatIsAskedForGoesByWholeValuesOfEveryType) {
    MemoryPixels<double> source(5, 1, 1, {1, 0.5, -1, 2, std::nan("")});
    RasterFacts facts = source.Facts();
    facts.bands[0].palette = {{1, 1, 1, 255}, {9, 8, 7, 255}};
    const Picture picture = Rendered(source, facts, Styled({{"colormap", "palette"}}));
    EXPECT_EQ(Bytes(picture.bytes.begin(), picture.bytes.begin() + 4), (Bytes{9, 8, 7, 255}));
    for (std::size_t i = 1; i < 5; ++i) EXPECT_EQ(picture.bytes[4 * i + 3], 0) << i;
}

TEST(Renderer, RealsAndComplexSamplesAreStretchedUnlessTheirPaletteIsAskedFor) {
    MemoryPixels<float> heights(3, 1, 1, {-10.5f, 0.25f, 11});
    RasterFacts facts = heights.Facts();
    facts.bands[0].palette = {{1, 1, 1, 255}, {9, 8, 7, 255}};
    EXPECT_EQ(Rendered(heights, facts, {}).bytes, (Bytes{0, 128, 255}));
    MemoryPixels<zelm::Complex<float>> waves(2, 1, 1, {{0, 0}, {3, 4}});
    facts = waves.Facts();
    facts.bands[0].palette = {{1, 1, 1, 255}, {9, 8, 7, 255}};
    EXPECT_EQ(Rendered(waves, facts, {}).bytes, (Bytes{0, 255}));
}

HistogramFacts Ramp(Number minimum, Number maximum, double binSize, std::size_t bins) {
    return {minimum, maximum, binSize, std::vector<std::uint64_t>(bins, 10)};
}

TEST(Renderer, TheUsualStretchGoesByTheHistogramThenTheStatisticsThenACoarseLevel) {
    MemoryPixels<short> source(2, 1, 1, {-5, 70});
    RasterFacts facts = source.Facts();
    EXPECT_EQ(BoundsOf(source, facts, {}), One(Number(-5), Number(70)));
    facts.bands[0].minimum = Number(-100);
    facts.bands[0].maximum = Number(1000);
    EXPECT_EQ(BoundsOf(source, facts, {}), One(Number(-100), Number(1000)));
    facts.bands[0].histogram = Ramp(Number(0), Number(99), 1, 100);
    EXPECT_EQ(BoundsOf(source, facts, {}), One(Number(1), Number(97)));
    source.readLevels.clear();
    EXPECT_EQ(BoundsOf(source, facts, {{"stretch", "p10,50"}}), One(Number(9), Number(49)));
    EXPECT_TRUE(source.readLevels.empty()) << "archived records need no samples";
}

TEST(Renderer, DeviationsGoByTheStatisticsOrByACoarseLevel) {
    MemoryPixels<short> source(4, 1, 1, {0, 10, 20, 30});
    RasterFacts facts = source.Facts();
    const auto measured = BoundsOf(source, facts, {{"stretch", "s2"}});
    EXPECT_NEAR(measured[0].minimum.real, 15 - 2 * std::sqrt(125), 1e-9);
    EXPECT_NEAR(measured[0].maximum.real, 15 + 2 * std::sqrt(125), 1e-9);
    facts.bands[0].mean = 100;
    facts.bands[0].deviation = 5;
    EXPECT_EQ(BoundsOf(source, facts, {{"stretch", "s2"}}), One(Number(90), Number(110)));
}

TEST(Renderer, PerCentsWithoutAHistogramAreThoseOfACoarseLevel) {
    std::vector<float> samples;
    for (int i = 0; i <= 100; ++i) samples.push_back(static_cast<float>(i));
    MemoryPixels<float> source(101, 1, 1, samples);
    EXPECT_EQ(BoundsOf(source, source.Facts(), {{"stretch", "p10,75"}}),
              One(Number(10), Number(75)));
}

TEST(Renderer, WhatIsMissingOrHiddenHasNoPartInACoarseLevelsBounds) {
    constexpr float inf = std::numeric_limits<float>::infinity();
    MemoryPixels<float> source(5, 1, 1, {-99, 3, inf, 8, 900});
    source.levels[0].mask = {1, 1, 1, 1, 0};
    RasterFacts facts = source.Facts();
    facts.bands[0].noData = Number(-99);
    EXPECT_EQ(BoundsOf(source, facts, {}), One(Number(3), Number(8)));
    EXPECT_EQ(BoundsOf(source, facts, {{"stretch", "p0,100"}}), One(Number(3), Number(8)));
    MemoryPixels<float> nothing(1, 1, 1, {inf});
    EXPECT_EQ(BoundsOf(nothing, nothing.Facts(), {}), One(Number(0), Number(1)));
}

TEST(Renderer, BoundsOfACoarseLevelAreExactInSixtyFourBits) {
    constexpr std::int64_t base = (std::int64_t{1} << 62) + 1;
    MemoryPixels<std::int64_t> source(3, 1, 1, {base + 1, base, base + 2});
    EXPECT_EQ(BoundsOf(source, source.Facts(), {}), One(Number(base), Number(base + 2)));
    EXPECT_EQ(Rendered(source, source.Facts(), {}).bytes, (Bytes{128, 0, 255}));
}

TEST(Renderer, BoundsAreEachBandsOwnOrOneForAll) {
    MemoryPixels<short> source(1, 1, 3, {1, 2, 3});
    const Range a{Number(0), Number(1)}, b{Number(0), Number(2)}, c{Number(3), Number(4)};
    EXPECT_EQ(BoundsOf(source, source.Facts(), {{"stretch", "0,1;0,2;3,4"}}),
              (std::vector<Range>{a, b, c}));
    EXPECT_EQ(BoundsOf(source, source.Facts(), {{"stretch", "0,2"}}),
              (std::vector<Range>{b, b, b}));
}

TEST(Renderer, AnExpressionIsStretchedByItsOwnValues) {
    MemoryPixels<unsigned char> source(3, 1, 2, {10, 30, 0, 0, 30, 10});
    const Pairs index{{"expression", "(b2-b1)/(b2+b1)"}};
    EXPECT_EQ(BoundsOf(source, source.Facts(), index), One(Number(-0.5), Number(0.5)));
    EXPECT_EQ(Rendered(source, source.Facts(), Styled(index)).bytes,
              (Bytes{255, 255, 0, 0, 0, 255}));
    EXPECT_EQ(
        Rendered(source, source.Facts(),
                 Styled({{"expression", "b2-b1"}, {"stretch", "-40,40"}, {"colormap", "grey"}}))
            .bytes,
        (Bytes{191, 191, 191, 128, 128, 128, 64, 64, 64}));
}

TEST(Renderer, AnExpressionIsMissingWhereOneOfItsBandsIs) {
    MemoryPixels<short> source(3, 1, 2, {1, -9, 5, 5, -9, 1});
    RasterFacts facts = source.Facts();
    facts.bands[0].noData = facts.bands[1].noData = Number(-9);
    EXPECT_EQ(
        Rendered(source, facts, Styled({{"expression", "max(b1,b2)"}, {"stretch", "0,5"}})).bytes,
        (Bytes{0, 0, 255, 255, 0, 0}));
}

TEST(Renderer, ALegendHasTheColoursBetweenTheBounds) {
    auto source = Bytewise(3);
    const Renderer colours(source.Facts(), {}, source);
    EXPECT_TRUE(colours.LegendColours().empty());
    const Renderer mapped(source.Facts(), Styled({{"bands", "1"}, {"colormap", "viridis"}}),
                          source);
    const Colormap map = *FindColormap("viridis");
    EXPECT_TRUE(std::equal(map.begin(), map.end(), mapped.LegendColours().begin()));
    const Renderer bent(source.Facts(), Styled({{"bands", "1"}, {"gamma", "2"}}), source);
    EXPECT_EQ(bent.LegendColours()[64][0], 128);
}

TEST(Renderer, RefusesWhatTheRasterDoesNotHave) {
    auto source = Bytewise(3);
    const RasterFacts facts = source.Facts();
    EXPECT_EQ(Refusal(source, facts, {{"bands", "4"}}),
              "bands: there is no band 4; the raster has 3");
    EXPECT_EQ(Refusal(source, facts, {{"expression", "b1/b9"}}),
              "expression: there is no band 9; the raster has 3");
    EXPECT_EQ(Refusal(source, facts, {{"colormap", "palette"}}),
              "colormap: the band has no palette");
}

TEST(Renderer, RefusesWhatDoesNotGoTogether) {
    auto source = Bytewise(3);
    const RasterFacts facts = source.Facts();
    EXPECT_EQ(Refusal(source, facts, {{"bands", "1,2,3"}, {"colormap", "turbo"}}),
              "colormap: it is for one band, not three");
    EXPECT_EQ(Refusal(source, facts, {{"bands", "1,2,3"}, {"hillshade", "1"}}),
              "hillshade: it is for one band, not three");
    EXPECT_EQ(Refusal(source, facts, {{"expression", "b1"}, {"bands", "1"}}),
              "expression: it takes the place of bands");
    EXPECT_EQ(Refusal(source, facts, {{"expression", "b1"}, {"hillshade", "1"}}),
              "expression: it does not go with hillshade");
    EXPECT_EQ(Refusal(source, facts, {{"expression", "b1"}, {"colormap", "palette"}}),
              "expression: it has no palette");
    EXPECT_EQ(Refusal(source, facts, {{"hillshade", "1"}, {"colormap", "palette"}}),
              "hillshade: it is not for a palette");
    EXPECT_EQ(Refusal(source, facts, {{"stretch", "0,1;0,1"}}),
              "stretch: it needs one pair, or as many as there are bands");
    EXPECT_EQ(Refusal(source, facts, {{"expression", "b1"}, {"stretch", "0,1;0,1"}}),
              "stretch: an expression has one pair");
}

TEST(Renderer, ThreadsRenderAtOnce) {
    MemoryPixels<float> source(16, 16, 2, {});
    for (int i = 0; i < 512; ++i)
        source.levels[0].samples.push_back(static_cast<float>(i * 37 % 101));
    for (const Pairs& style : {Pairs{{"bands", "1"}, {"gamma", "3"}, {"colormap", "turbo"}},
                               Pairs{{"expression", "b1/b2"}, {"stretch", "0,2"}}}) {
        const Renderer renderer(source.Facts(), Styled(style), source);
        const Samples samples{.data = source.levels[0].samples.data(), .width = 16, .height = 8};
        const Bytes expected = renderer.Render(samples).bytes;
        std::vector<Bytes> made(8);
        std::vector<std::thread> threads;
        for (Bytes& bytes : made)
            threads.emplace_back([&] {
                for (int i = 0; i < 50; ++i) bytes = renderer.Render(samples).bytes;
            });
        for (std::thread& thread : threads) thread.join();
        for (const Bytes& bytes : made) EXPECT_EQ(bytes, expected);
    }
}

TEST(Renderer, ARasterThatCannotBeShownIsRefused) {
    auto source = Bytewise(1);
    RasterFacts facts = source.Facts();
    facts.pixelType = 77;
    EXPECT_EQ(Refusal(source, facts, {}), "bands: the raster has no samples that can be shown");
    facts = source.Facts();
    facts.bands.clear();
    EXPECT_EQ(Refusal(source, facts, {}), "bands: the raster has no samples that can be shown");
}

}  // namespace
}  // namespace zmcrender
