// Lit heights against the formula in its plain form, and the factor that suits heights.
#include <gtest/gtest.h>

#include <rapidcheck.h>
#include <cmath>
#include <numbers>
#include <random>
#include <vector>

#include "render/Hillshade.h"
#include "tests/render/MemoryPixels.h"

namespace zmcrender {
namespace {

using zmctest::MemoryPixels;
using zmctest::Styled;

// A field of heights, whose edges go on with the nearest height.
struct Field {
    std::uint32_t width, height;
    std::vector<float> heights;

    double At(int x, int y) const {
        x = std::clamp<int>(x, 0, static_cast<int>(width) - 1);
        y = std::clamp<int>(y, 0, static_cast<int>(height) - 1);
        return heights[static_cast<std::size_t>(y) * width + static_cast<std::size_t>(x)];
    }
    // By slope and aspect, which the renderer does not compute.
    double Shade(int x, int y, double azimuth, double altitude, double z) const {
        const double centre = At(x, y);
        const auto near = [&](int dx, int dy) {
            const double value = At(x + dx, y + dy);
            return std::isnan(value) ? centre : value;
        };
        const double east = ((near(1, -1) + 2 * near(1, 0) + near(1, 1)) -
                             (near(-1, -1) + 2 * near(-1, 0) + near(-1, 1))) /
                            8 * z;
        const double south = ((near(-1, 1) + 2 * near(0, 1) + near(1, 1)) -
                              (near(-1, -1) + 2 * near(0, -1) + near(1, -1))) /
                             8 * z;
        const double radian = std::numbers::pi / 180;
        const double slope = std::atan(std::hypot(east, south));
        const double downhill = std::atan2(-east, south);  // clockwise from the top
        const double zenith = (90 - altitude) * radian;
        return std::max(
            0.0, std::cos(zenith) * std::cos(slope) +
                     std::sin(zenith) * std::sin(slope) * std::cos(azimuth * radian - downhill));
    }
};

Field AnyField(std::mt19937_64& random) {
    Field field{static_cast<std::uint32_t>(1 + random() % 12),
                static_cast<std::uint32_t>(1 + random() % 12),
                {}};
    for (std::uint32_t i = 0; i < field.width * field.height; ++i)
        field.heights.push_back(random() % 12 == 0 ? std::nanf("")
                                                   : static_cast<float>(random() % 400) / 16);
    return field;
}

TEST(Hillshade, IsThePlainFormulaAtEveryPixelEdgesAndHolesIncluded) {
    EXPECT_TRUE(rc::check([](std::uint64_t seed) {
        std::mt19937_64 random(seed);
        const Field field = AnyField(random);
        const double azimuth = static_cast<double>(random() % 360);
        const double altitude = static_cast<double>(random() % 91);
        const double z = static_cast<double>(1 + random() % 40) / 8;
        MemoryPixels<float> source(field.width, field.height, 1, field.heights);
        const Picture picture = zmctest::Rendered(source, source.Facts(),
                                                  Styled({{"hillshade", "1"},
                                                          {"azimuth", std::to_string(azimuth)},
                                                          {"altitude", std::to_string(altitude)},
                                                          {"zfactor", std::to_string(z)}}));
        for (std::uint32_t i = 0; i < field.width * field.height; ++i) {
            const unsigned char* const pixel = &picture.bytes[i * picture.channels];
            if (std::isnan(field.heights[i])) {
                RC_ASSERT(picture.channels == 2u && pixel[1] == 0);
                continue;
            }
            const double shade =
                field.Shade(static_cast<int>(i % field.width), static_cast<int>(i / field.width),
                            azimuth, altitude, z);
            RC_ASSERT(std::fabs(pixel[0] - 255 * shade) <= 0.5 + 1e-6);
        }
    }));
}

TEST(Hillshade, FlatLandIsAsBrightAsTheLightIsHigh) {
    MemoryPixels<short> source(3, 3, 1, std::vector<short>(9, 700));
    const auto shown = [&](const char* altitude) {
        return zmctest::Rendered(source, source.Facts(),
                                 Styled({{"hillshade", "1"}, {"altitude", altitude}}))
            .bytes;
    };
    EXPECT_EQ(shown("90"), std::vector<unsigned char>(9, 255));
    EXPECT_EQ(shown("53.13010235415598"), std::vector<unsigned char>(9, 204));
    EXPECT_EQ(shown("0"), std::vector<unsigned char>(9, 0));
}

TEST(Hillshade, LightFromTheUpperLeftFallsOnSlopesThatFaceIt) {
    // A ridge from the lower left to the upper right.
    std::vector<float> heights;
    for (int y = 0; y < 9; ++y)
        for (int x = 0; x < 9; ++x) heights.push_back(static_cast<float>(-std::abs(x + y - 8)));
    MemoryPixels<float> source(9, 9, 1, heights);
    const Picture picture =
        zmctest::Rendered(source, source.Facts(), Styled({{"hillshade", "1"}, {"zfactor", "1"}}));
    EXPECT_GT(picture.bytes[2 * 9 + 2], 200);
    EXPECT_LT(picture.bytes[6 * 9 + 6], 60);
}

// The same slope, seen on a level of which a pixel covers four.
TEST(Hillshade, SlopesAreThoseOfLevelZeroOnEveryLevel) {
    std::vector<float> fine, coarse;
    for (int i = 0; i < 64; ++i) fine.push_back(static_cast<float>(i % 8));
    for (int i = 0; i < 16; ++i) coarse.push_back(static_cast<float>(i % 4 * 2) + 0.5f);
    MemoryPixels<float> source(8, 8, 1, fine);
    source.levels.push_back({4, 4, coarse, {}});
    const Renderer renderer(source.Facts(), Styled({{"hillshade", "1"}, {"zfactor", "1"}}), source);
    const Picture zero = RenderWindow(renderer, source, {0, 0, 8, 8}, 8, 8);
    const Picture one = RenderWindow(renderer, source, {0, 0, 8, 8}, 4, 4);
    EXPECT_EQ(source.readLevels, (std::vector<std::uint32_t>{0, 1}));
    EXPECT_EQ(zero.bytes[3 * 8 + 3], one.bytes[1 * 4 + 1]);
}

TEST(Hillshade, TheSuitingFactorDoesNotDependOnTheUnitOfHeights) {
    std::mt19937_64 random(5);
    std::vector<float> metres, feet;
    for (int i = 0; i < 400; ++i) {
        metres.push_back(static_cast<float>(random() % 1000));
        feet.push_back(metres.back() * 4);
    }
    MemoryPixels<float> inMetres(20, 20, 1, metres), inFeet(20, 20, 1, feet);
    const Style style = Styled({{"hillshade", "1"}});
    EXPECT_EQ(zmctest::Rendered(inMetres, inMetres.Facts(), style).bytes,
              zmctest::Rendered(inFeet, inFeet.Facts(), style).bytes);
    // A plane that rises by the suiting slope needs no factor.
    std::vector<float> plane;
    for (int i = 0; i < 10000; ++i) plane.push_back(static_cast<float>(kSuitingSlope * (i % 100)));
    MemoryPixels<float> rising(100, 100, 1, plane);
    const Picture suited = zmctest::Rendered(rising, rising.Facts(), style);
    const Picture plain =
        zmctest::Rendered(rising, rising.Facts(), Styled({{"hillshade", "1"}, {"zfactor", "1"}}));
    EXPECT_NEAR(suited.bytes[5050], plain.bytes[5050], 1);
}

TEST(Hillshade, ColoursAreLit) {
    std::mt19937_64 random(6);
    std::vector<float> heights;
    for (int i = 0; i < 100; ++i) heights.push_back(static_cast<float>(random() % 100));
    MemoryPixels<float> source(10, 10, 1, heights);
    const auto shown = [&](bool hillshade, bool colours) {
        Style style = Styled({{"stretch", "0,100"}, {"zfactor", "0.02"}});
        if (hillshade) style.Set("hillshade", "1");
        if (colours) style.Set("colormap", "viridis");
        return zmctest::Rendered(source, source.Facts(), style);
    };
    const Picture light = shown(true, false), colours = shown(false, true), lit = shown(true, true);
    ASSERT_EQ(lit.channels, 3u);
    for (std::size_t i = 0; i < lit.bytes.size(); ++i)
        EXPECT_NEAR(lit.bytes[i], colours.bytes[i] * (0.3 + 0.7 * light.bytes[i / 3] / 255), 1);
}

}  // namespace
}  // namespace zmcrender
