// The formula of styles against a plain model, over all element types.
#include <gtest/gtest.h>

#include <rapidcheck.h>
#include <cmath>
#include <cstring>
#include <limits>
#include <random>
#include <vector>

#include "render/Colormaps.h"
#include "tests/render/MemoryPixels.h"
#include "tests/support/ElementTypeList.h"

namespace zmcrender {
namespace {

using zmctest::MemoryPixels;
using Wide = long double;

template <class T>
T AnySample(std::mt19937_64& random) {
    if constexpr (zelm::kIsComplex<T>) {
        using P = decltype(T::re);
        return {AnySample<P>(random), AnySample<P>(random)};
    } else if constexpr (std::is_floating_point_v<T>) {
        const T odd[] = {std::numeric_limits<T>::quiet_NaN(), std::numeric_limits<T>::infinity(),
                         -std::numeric_limits<T>::infinity(), T(0), T(-0.0)};
        if (random() % 8 == 0) return odd[random() % 5];
        return static_cast<T>(static_cast<double>(random() % 20001) / 100 - 100);
    } else {
        const T ends[] = {std::numeric_limits<T>::min(), std::numeric_limits<T>::max(), T(0), T(1)};
        if (random() % 4 == 0) return ends[random() % 4];
        return random() % 2 == 0 ? static_cast<T>(random() % 200) : static_cast<T>(random());
    }
}

template <class T>
bool IsFinite(const T& sample) {
    if constexpr (zelm::kIsComplex<T>)
        return std::isfinite(sample.re) && std::isfinite(sample.im);
    else if constexpr (std::is_floating_point_v<T>)
        return std::isfinite(sample);
    else
        return true;
}

template <class T>
Wide ValueOf(const T& sample) {
    if constexpr (zelm::kIsComplex<T>)
        return std::hypot(static_cast<double>(sample.re), static_cast<double>(sample.im));
    else
        return static_cast<Wide>(sample);
}

// A bound as a text, and its value: any of the type, and numbers beyond it and between.
template <class T>
std::pair<std::string, Wide> AnyBound(std::mt19937_64& random) {
    if constexpr (std::is_integral_v<T>) {
        if (random() % 3 != 0) {
            const T value = AnySample<T>(random);
            return {std::to_string(value), static_cast<Wide>(value)};
        }
    }
    const double value = static_cast<double>(static_cast<int>(random() % 4001) - 2000) / 8;
    return {Number(value).Text(), value};
}

Wide PlaceOf(Wide value, Wide minimum, Wide maximum) {
    if (minimum == maximum) return value >= maximum ? 1 : 0;
    return std::clamp<Wide>((value - minimum) / (maximum - minimum), 0, 1);
}

// Whether a level is that of the formula; either of two where they meet.
bool IsLevel(unsigned level, Wide t, double gamma, Wide most) {
    const Wide exact = most * std::pow(t, 1 / static_cast<Wide>(gamma)) + 0.5L;
    return static_cast<Wide>(level) <= exact + 1e-6L &&
           exact - 1e-6L < static_cast<Wide>(level) + 1;
}

template <class T>
class Formula : public testing::Test {};
TYPED_TEST_SUITE(Formula, zmctest::AllElementTypes, zmctest::ElementTypeNames);

template <class T>
struct Trial {
    std::vector<T> samples;
    std::string minimumText, maximumText;
    Wide minimum, maximum;
    double gamma;
    std::optional<T> noData;

    explicit Trial(std::uint64_t seed) {
        std::mt19937_64 random(seed);
        constexpr double kGammas[] = {1, 1, 2.2, 0.45, 100, 0.01};
        gamma = kGammas[random() % 6];
        std::tie(minimumText, minimum) = AnyBound<T>(random);
        std::tie(maximumText, maximum) = AnyBound<T>(random);
        if (random() % 8 == 0) std::tie(maximumText, maximum) = std::tie(minimumText, minimum);
        for (int i = 0; i < 60; ++i) samples.push_back(AnySample<T>(random));
        if constexpr (!zelm::kIsComplex<T>)
            if (random() % 2 == 0 && IsFinite(samples[7])) noData = samples[7];
    }
    bool IsMissing(const T& sample) const {
        return !IsFinite(sample) || (noData && sample == *noData);
    }
    Style MakeStyle() const {
        return zmctest::Styled(
            {{"stretch", minimumText + "," + maximumText}, {"gamma", Number(gamma).Text()}});
    }
    Picture Render(const Style& style) const {
        MemoryPixels<T> source(10, 6, 1, samples);
        RasterFacts facts = source.Facts();
        if constexpr (!zelm::kIsComplex<T>)
            if (noData) facts.bands[0].noData = Number(*noData);
        return zmctest::Rendered(source, facts, style);
    }
};

TYPED_TEST(Formula, ALevelIsThatOfThePlainFormulaAndWhatIsMissingIsTransparent) {
    EXPECT_TRUE(rc::check([](std::uint64_t seed) {
        const Trial<TypeParam> trial(seed);
        const Picture picture = trial.Render(trial.MakeStyle());
        const bool hasAlpha = picture.HasAlpha();
        bool anyMissing = false;
        for (std::size_t i = 0; i < trial.samples.size(); ++i) {
            const TypeParam& sample = trial.samples[i];
            const bool missing = trial.IsMissing(sample);
            anyMissing |= missing;
            if (missing) {
                RC_ASSERT(hasAlpha);
                RC_ASSERT(picture.bytes[2 * i + 1] == 0);
                continue;
            }
            if (hasAlpha) RC_ASSERT(picture.bytes[2 * i + 1] == 255);
            const Wide t = PlaceOf(ValueOf(sample), trial.minimum, trial.maximum);
            RC_ASSERT(IsLevel(picture.bytes[i * picture.channels], t, trial.gamma, 255));
        }
        RC_ASSERT(hasAlpha == anyMissing);
    }));
}

TYPED_TEST(Formula, SixteenBitsFollowItToo) {
    EXPECT_TRUE(rc::check([](std::uint64_t seed) {
        const Trial<TypeParam> trial(seed);
        Style style = trial.MakeStyle();
        style.Set("depth", "16");
        const Picture picture = trial.Render(style);
        for (std::size_t i = 0; i < trial.samples.size(); ++i) {
            if (trial.IsMissing(trial.samples[i])) continue;
            std::uint16_t level = 0;
            std::memcpy(&level, &picture.bytes[2 * i * picture.channels], sizeof level);
            const Wide t = PlaceOf(ValueOf(trial.samples[i]), trial.minimum, trial.maximum);
            RC_ASSERT(IsLevel(level, t, trial.gamma, 65535));
        }
    }));
}

TYPED_TEST(Formula, AColourMapPicksTheEntryOfTheLevel) {
    EXPECT_TRUE(rc::check([](std::uint64_t seed) {
        const Trial<TypeParam> trial(seed);
        Style style = trial.MakeStyle();
        const Picture grey = trial.Render(style);
        style.Set("colormap", "-magma");
        const Picture coloured = trial.Render(style);
        const Colormap map = *FindColormap("-magma");
        RC_ASSERT(coloured.channels == grey.channels + 2);
        for (std::size_t i = 0; i < trial.samples.size(); ++i)
            for (std::size_t part = 0; part < 3; ++part)
                RC_ASSERT(coloured.bytes[i * coloured.channels + part] ==
                          map[grey.bytes[i * grey.channels]][part]);
    }));
}

TYPED_TEST(Formula, PlanarSamplesMakeTheSamePictureAsInterleavedOnes) {
    EXPECT_TRUE(rc::check([](std::uint64_t seed) {
        using T = TypeParam;
        std::mt19937_64 random(seed);
        std::vector<T> interleaved(5 * 4 * 3), planar(interleaved.size());
        for (std::size_t i = 0; i < interleaved.size(); ++i) {
            interleaved[i] = AnySample<T>(random);
            planar[i % 3 * 20 + i / 3] = interleaved[i];
        }
        MemoryPixels<T> source(5, 4, 3, interleaved);
        const Renderer renderer(source.Facts(), zmctest::Styled({{"stretch", "0,150"}}), source);
        Samples samples{.data = interleaved.data(), .width = 5, .height = 4};
        const Picture picture = renderer.Render(samples);
        samples.data = planar.data();
        samples.planar = true;
        RC_ASSERT(renderer.Render(samples).bytes == picture.bytes);
    }));
}

// No double holds any of these, and all would be one.
TEST(FormulaOfWideIntegers, NeighboursBeyondDoublesAreToldApart) {
    constexpr std::int64_t base = (std::int64_t{1} << 62) + 1;
    MemoryPixels<std::int64_t> source(6, 1, 1,
                                      {base - 1, base, base + 1, base + 2, base + 4, -base});
    const Style style =
        zmctest::Styled({{"stretch", std::to_string(base) + "," + std::to_string(base + 4)}});
    EXPECT_EQ(zmctest::Rendered(source, source.Facts(), style).bytes,
              (std::vector<unsigned char>{0, 0, 64, 128, 255, 0}));
}

TEST(FormulaOfComplexNumbers, ThePartThatTheStyleNamesIsShown) {
    using C = zelm::Complex<float>;
    MemoryPixels<C> source(3, 1, 1, {C(3, 4), C(-3, 0), C(0, -2)});
    const auto shown = [&](const char* part, const char* stretch) {
        return zmctest::Rendered(source, source.Facts(),
                                 zmctest::Styled({{"complex", part}, {"stretch", stretch}}))
            .bytes;
    };
    using Bytes = std::vector<unsigned char>;
    EXPECT_EQ(shown("magnitude", "0,255"), (Bytes{5, 3, 2}));
    EXPECT_EQ(shown("real", "-10,245"), (Bytes{13, 7, 10}));
    EXPECT_EQ(shown("imaginary", "-10,245"), (Bytes{14, 10, 8}));
    EXPECT_EQ(shown("phase", "-3.141592653589793,3.141592653589793"), (Bytes{165, 255, 64}));
}

}  // namespace
}  // namespace zmcrender
