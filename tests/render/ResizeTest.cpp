// Other sizes of pictures against a model that works pixel by pixel in doubles.
#include <gtest/gtest.h>

#include <rapidcheck.h>
#include <algorithm>
#include <cmath>
#include <cstring>
#include <random>
#include <vector>

#include "render/Resize.h"

namespace zmcrender {
namespace {

double LevelOf(const Picture& picture, std::size_t x, std::size_t y, std::uint32_t channel) {
    const std::size_t at = (y * picture.width + x) * picture.channels + channel;
    if (picture.depth == 8) return picture.bytes[at];
    std::uint16_t level = 0;
    std::memcpy(&level, &picture.bytes[2 * at], sizeof level);
    return level;
}

// The weight of pixel `i` of `size` in pixel `place` of `target`, for `extent` pixels from `start`.
double Weight(std::uint32_t size, double start, double extent, std::uint32_t target,
              std::uint32_t place, std::uint32_t i) {
    const double step = extent / target;
    if (step >= 1) {
        const double from = start + place * step, to = start + (place + 1) * step;
        return std::max(0.0, std::min(to, i + 1.0) - std::max(from, static_cast<double>(i)));
    }
    const double centre =
        std::clamp(start + (place + 0.5) * step - 0.5, 0.0, static_cast<double>(size) - 1);
    return std::max(0.0, 1 - std::fabs(centre - i));
}

// Colour and alpha of a pixel of the target.
std::vector<double> Modelled(const Picture& picture, const Area& area, std::uint32_t width,
                             std::uint32_t height, std::uint32_t x, std::uint32_t y) {
    const double most = picture.depth == 8 ? 255 : 65535;
    const std::uint32_t colours = picture.channels - (picture.HasAlpha() ? 1 : 0);
    std::vector<double> sums(colours + 1);
    double weights = 0;
    for (std::uint32_t row = 0; row < picture.height; ++row)
        for (std::uint32_t column = 0; column < picture.width; ++column) {
            const double weight = Weight(picture.width, area.x, area.width, width, x, column) *
                                  Weight(picture.height, area.y, area.height, height, y, row);
            const double alpha =
                picture.HasAlpha() ? LevelOf(picture, column, row, colours) / most : 1;
            for (std::uint32_t part = 0; part < colours; ++part)
                sums[part] += weight * alpha * LevelOf(picture, column, row, part);
            sums[colours] += weight * alpha;
            weights += weight;
        }
    for (std::uint32_t part = 0; part < colours; ++part)
        sums[part] = sums[colours] > 0 ? sums[part] / sums[colours] : 0;
    sums[colours] *= most / weights;
    return sums;
}

Picture AnyPicture(std::mt19937_64& random) {
    Picture picture{static_cast<std::uint32_t>(1 + random() % 20),
                    static_cast<std::uint32_t>(1 + random() % 20),
                    static_cast<std::uint32_t>(1 + random() % 4),
                    random() % 2 == 0 ? 8u : 16u,
                    {}};
    picture.bytes.resize(picture.LineBytes() * picture.height);
    for (auto& byte : picture.bytes) byte = static_cast<unsigned char>(random());
    return picture;
}

Area AnyArea(std::mt19937_64& random, const Picture& picture) {
    const auto part = [&](std::uint32_t size) {
        const double start = static_cast<double>(random() % (4 * size)) / 4;
        const double extent = (1 + static_cast<double>(random() % (4 * size))) / 4;
        return std::pair(start, std::min(extent, size - start));
    };
    const auto [x, width] = part(picture.width);
    const auto [y, height] = part(picture.height);
    return {x, y, width, height};
}

TEST(Resize, IsTheAverageOfTheAreaOrBetweenTheNearestCentres) {
    EXPECT_TRUE(rc::check([](std::uint64_t seed) {
        std::mt19937_64 random(seed);
        const Picture picture = AnyPicture(random);
        const Area area = AnyArea(random, picture);
        const auto width = static_cast<std::uint32_t>(1 + random() % 25);
        const auto height = static_cast<std::uint32_t>(1 + random() % 25);
        const Picture made = Resize(picture, area, width, height);
        RC_ASSERT(made.width == width && made.height == height);
        RC_ASSERT(made.channels == picture.channels && made.depth == picture.depth);
        const std::uint32_t colours = picture.channels - (picture.HasAlpha() ? 1 : 0);
        for (std::uint32_t y = 0; y < height; ++y)
            for (std::uint32_t x = 0; x < width; ++x) {
                const auto model = Modelled(picture, area, width, height, x, y);
                if (picture.HasAlpha())
                    RC_ASSERT(std::fabs(LevelOf(made, x, y, colours) - model[colours]) <= 0.51);
                // Of next to no alpha no colour is left that could be told.
                if (model[colours] < 0.5) continue;
                for (std::uint32_t part = 0; part < colours; ++part)
                    RC_ASSERT(std::fabs(LevelOf(made, x, y, part) - model[part]) <= 0.55);
            }
    }));
}

TEST(Resize, TheSameSizeIsTheSamePicture) {
    std::mt19937_64 random(3);
    for (int i = 0; i < 20; ++i) {
        Picture picture = AnyPicture(random);
        EXPECT_EQ(Resize(picture, picture.width, picture.height).bytes, picture.bytes);
        // Through the arithmetic as well, where no colour is lost to transparency.
        if (picture.HasAlpha()) continue;
        const Area all{0, 0, static_cast<double>(picture.width),
                       static_cast<double>(picture.height)};
        EXPECT_EQ(Resize(picture, all, picture.width, picture.height).bytes, picture.bytes);
    }
}

TEST(Resize, OneColourStaysOneColour) {
    const Picture picture{7, 5, 3, 8, std::vector<unsigned char>(105, 201)};
    for (const std::uint32_t size : {1u, 2u, 3u, 6u, 7u, 9u, 100u})
        EXPECT_EQ(Resize(picture, size, size).bytes,
                  std::vector<unsigned char>(3 * size * size, 201));
}

TEST(Resize, WhatIsTransparentLendsNoColour) {
    const Picture picture{2, 1, 4, 8, {255, 0, 0, 255, 0, 255, 0, 0}};
    EXPECT_EQ(Resize(picture, 1, 1).bytes, (std::vector<unsigned char>{255, 0, 0, 128}));
}

}  // namespace
}  // namespace zmcrender
