// What a renderer learns of pyramids from their archived documents, and what it makes of it.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <random>
#include <vector>

#include "host/build/PyramidBuilder.h"
#include "render/RasterFacts.h"
#include "render/Renderer.h"
#include "tests/support/ElementTypeList.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmcrender {
namespace {

using zmchost::Access;
using zmchost::Raster;
using zmctest::MemorySource;
using zmctest::TestModule;
using Numbers = std::vector<std::uint32_t>;

template <class T>
class FactsOfPyramids : public testing::Test {
protected:
    Raster Built(MemorySource<T>& source) {
        zmchost::PyramidBuilder(TestModule()).Build(source, file);
        return Raster::Open(TestModule(), file, Access::Read);
    }
    zmctest::ScratchDirectory folder;
    const std::string file = folder / "a.pyr";
};
TYPED_TEST_SUITE(FactsOfPyramids, zmctest::AllElementTypes, zmctest::ElementTypeNames);

TYPED_TEST(FactsOfPyramids, ExtremesAndHistogramsAreThoseOfTheFile) {
    using T = TypeParam;
    MemorySource<T> source(70, 50, 2);
    source.FillWithNoise(4);
    const Raster raster = this->Built(source);
    const RasterFacts facts = FactsOf(raster);
    ASSERT_EQ(facts.bands.size(), 2u);
    EXPECT_EQ(facts.pixelType, zelm::ElementTraits<T>::code);
    EXPECT_EQ(facts.name, this->file);
    for (std::uint32_t band = 0; band < 2; ++band) {
        const BandFacts& of = facts.bands[band];
        EXPECT_TRUE(of.palette.empty());
        EXPECT_FALSE(of.noData);
        if constexpr (zelm::kIsComplex<T>) {
            EXPECT_FALSE(of.minimum || of.maximum || of.histogram);
        } else {
            std::vector<T> samples;
            for (std::size_t i = band; i < source.pixels.size(); i += 2)
                samples.push_back(source.pixels[i]);
            const auto [lowest, highest] = std::minmax_element(samples.begin(), samples.end());
            // Documents keep integers as they are, and reals with so many digits.
            const double most = std::is_integral_v<T> ? 0 : 1e-6 * std::fabs(Number(*highest).real);
            ASSERT_TRUE(of.minimum && of.maximum);
            EXPECT_NEAR(of.minimum->real, Number(*lowest).real, most);
            EXPECT_NEAR(of.maximum->real, Number(*highest).real, most);
            if constexpr (std::is_integral_v<T>) {
                EXPECT_EQ(of.minimum, Number(*lowest));
                EXPECT_EQ(of.maximum, Number(*highest));
            }
            ASSERT_TRUE(of.mean && of.deviation && of.histogram);
            std::uint64_t counted = 0;
            for (const std::uint64_t count : of.histogram->counts) counted += count;
            EXPECT_EQ(counted, 70u * 50u);
        }
    }
}

TYPED_TEST(FactsOfPyramids, TheUsualStretchOfAFileLiesWithinItsExtremes) {
    using T = TypeParam;
    MemorySource<T> source(300, 200, 1);
    source.FillWithNoise(8);
    Raster raster = this->Built(source);
    RasterPixels pixels(raster);
    const RasterFacts facts = FactsOf(raster);
    const Renderer renderer(facts, {}, pixels);
    ASSERT_EQ(renderer.Bounds().size(), 1u);
    const Range bounds = renderer.Bounds()[0];
    EXPECT_LT(bounds.minimum.real, bounds.maximum.real);
    if constexpr (!zelm::kIsComplex<T>) {
        EXPECT_GE(bounds.minimum.real, facts.bands[0].minimum->real);
        EXPECT_LE(bounds.maximum.real, facts.bands[0].maximum->real);
    }
    const Picture picture = RenderWindow(renderer, pixels, WholeOf(pixels), 60, 40);
    EXPECT_EQ(picture.width, 60u);
    EXPECT_EQ(picture.channels, 1u);
}

using FactsOfBytes = FactsOfPyramids<unsigned char>;

TEST_F(FactsOfBytes, PalettesAreThoseOfTheFileAndNoDataThoseOfTheRaster) {
    MemorySource<unsigned char> source(4, 4, 2);
    Raster raster = Raster::Create(TestModule(), file, source.props, 0);
    raster.Write<unsigned char>(0, {0, 0, 4, 4}, std::vector<unsigned char>(32, 1));
    zelm::Palette palette;
    zelm::Color colour;
    colour.red = 10, colour.green = 20, colour.blue = 30, colour.alpha = 40, colour.isNull = 0;
    palette.AddColor(colour);
    colour.red = 50;
    palette.AddColor(colour);
    raster.SetBandPalette(1, palette);
    raster.SetNoDataValues({{0, 7}});
    const RasterFacts facts = FactsOf(raster);
    EXPECT_TRUE(facts.bands[0].palette.empty());
    EXPECT_EQ(facts.bands[0].noData, Number(7));
    EXPECT_FALSE(facts.bands[1].noData);
    EXPECT_EQ(facts.bands[1].meaning, BandMeaning::Palette);
    const std::vector<std::array<unsigned char, 4>> expected{{10, 20, 30, 40}, {50, 20, 30, 40}};
    EXPECT_EQ(facts.bands[1].palette, expected);
}

RasterFacts WithMeanings(std::vector<BandMeaning> meanings) {
    RasterFacts facts{"", zelm::PixelTypeCode::Byte, std::vector<BandFacts>(meanings.size())};
    for (std::size_t i = 0; i < meanings.size(); ++i) facts.bands[i].meaning = meanings[i];
    return facts;
}

TEST(UsualBands, GoByTheMeaningsOfTheBands) {
    using enum BandMeaning;
    EXPECT_EQ(UsualBands(WithMeanings({Unknown})), (Numbers{1}));
    EXPECT_EQ(UsualBands(WithMeanings({Grey, Unknown})), (Numbers{1}));
    EXPECT_EQ(UsualBands(WithMeanings({Grey, Alpha})), (Numbers{1, 2}));
    EXPECT_EQ(UsualBands(WithMeanings({Unknown, Unknown, Unknown})), (Numbers{1, 2, 3}));
    EXPECT_EQ(UsualBands(WithMeanings({Unknown, Unknown, Unknown, Unknown})), (Numbers{1, 2, 3}));
    EXPECT_EQ(UsualBands(WithMeanings({Red, Green, Blue, Alpha})), (Numbers{1, 2, 3, 4}));
    EXPECT_EQ(UsualBands(WithMeanings({Alpha, Blue, Green, Red})), (Numbers{4, 3, 2, 1}));
    EXPECT_EQ(UsualBands(WithMeanings({Unknown, Blue, Green, Red})), (Numbers{4, 3, 2}));
    RasterFacts facts = WithMeanings({Palette, Unknown, Unknown});
    facts.bands[0].palette.push_back({1, 2, 3, 255});
    EXPECT_EQ(UsualBands(facts), (Numbers{1}));
    facts.pixelType = zelm::PixelTypeCode::Single;
    EXPECT_EQ(UsualBands(facts), (Numbers{1, 2, 3}));
}

TEST(PercentileOf, OfBinsOfOneValueIsTheValueBelowWhichThatManyLie) {
    std::mt19937 random(3);
    for (int round = 0; round < 200; ++round) {
        HistogramFacts histogram{Number(-20), Number(29), 1, std::vector<std::uint64_t>(50)};
        std::vector<int> samples;
        for (int i = 0; i < 100; ++i) samples.push_back(static_cast<int>(random() % 50));
        for (const int sample : samples) ++histogram.counts[static_cast<std::size_t>(sample)];
        std::sort(samples.begin(), samples.end());
        for (int percent = 1; percent <= 100; ++percent)
            ASSERT_EQ(PercentileOf(histogram, percent, zelm::PixelTypeCode::Int16),
                      Number(samples[static_cast<std::size_t>(percent) - 1] - 20));
        ASSERT_EQ(PercentileOf(histogram, 0, zelm::PixelTypeCode::Int16), Number(samples[0] - 20));
    }
}

TEST(PercentileOf, OfRealsLiesBetweenTheEndsOfABin) {
    const HistogramFacts histogram{Number(1.0), Number(9.0), 2, {10, 0, 30, 60}};
    const auto at = [&](double percent) {
        return PercentileOf(histogram, percent, zelm::PixelTypeCode::Single)->real;
    };
    EXPECT_DOUBLE_EQ(at(0), 1);
    EXPECT_DOUBLE_EQ(at(5), 2);
    EXPECT_DOUBLE_EQ(at(10), 3);
    EXPECT_DOUBLE_EQ(at(25), 6);
    EXPECT_DOUBLE_EQ(at(40), 7);
    EXPECT_DOUBLE_EQ(at(70), 8);
    EXPECT_DOUBLE_EQ(at(100), 9);
}

TEST(PercentileOf, OfIntegersInWideBinsIsAnInteger) {
    const HistogramFacts histogram{Number(100), Number(1099), 10,
                                   std::vector<std::uint64_t>(100, 4)};
    EXPECT_EQ(PercentileOf(histogram, 0.5, zelm::PixelTypeCode::UInt16), Number(105));
    EXPECT_EQ(PercentileOf(histogram, 50, zelm::PixelTypeCode::UInt16), Number(599));
    EXPECT_EQ(PercentileOf(histogram, 100, zelm::PixelTypeCode::UInt16), Number(1099));
}

TEST(PercentileOf, OfWideIntegersIsExact) {
    constexpr std::int64_t base = (std::int64_t{1} << 62) + 1;
    const HistogramFacts histogram{Number(base), Number(base + 9), 1,
                                   std::vector<std::uint64_t>(10, 1)};
    EXPECT_EQ(PercentileOf(histogram, 50, zelm::PixelTypeCode::Int64), Number(base + 4));
    const HistogramFacts negative{Number(-base), Number(-base + 9), 1,
                                  std::vector<std::uint64_t>(10, 1)};
    EXPECT_EQ(PercentileOf(negative, 30, zelm::PixelTypeCode::Int64), Number(-base + 2));
}

TEST(PercentileOf, IsNeverAboveTheMaximumAndNoneWithoutCounts) {
    const HistogramFacts histogram{Number(0.0), Number(2.5), 1, {1, 1, 1}};
    EXPECT_EQ(PercentileOf(histogram, 100, zelm::PixelTypeCode::Double), Number(2.5));
    EXPECT_FALSE(PercentileOf({Number(0), Number(9), 1, {0, 0}}, 50, zelm::PixelTypeCode::Byte));
    EXPECT_FALSE(PercentileOf({Number(0), Number(9), 1, {}}, 50, zelm::PixelTypeCode::Byte));
}

}  // namespace
}  // namespace zmcrender
