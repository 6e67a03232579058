// The strip below a picture: its bar, and the numbers, which a test reads back from their pixels.
#include <gtest/gtest.h>

#include <cmath>
#include <map>
#include <string>
#include <vector>

#include "render/Colormaps.h"
#include "render/Legend.h"
#include "tests/render/MemoryPixels.h"

namespace zmcrender {
namespace {

using zmctest::MemoryPixels;
using zmctest::Styled;
using Pairs = std::vector<std::pair<std::string, std::string>>;

Picture Legended(const Pairs& pairs, std::uint32_t width = 400) {
    MemoryPixels<float> source(2, 2, 1, {1, 2, 3, 4});
    const Renderer renderer(source.Facts(), Styled(pairs), source);
    return WithLegend(RenderWindow(renderer, source, {0, 0, 2, 2}, width, 10), renderer);
}

bool IsInk(const Picture& picture, std::uint32_t x, std::uint32_t y) {
    return picture.bytes[(std::size_t{y} * picture.width + x) * picture.channels] < 100;
}

// Columns of a text's pixels, up to the first gap that is wider than one between characters.
std::string Shape(const Picture& picture, std::uint32_t x0, std::uint32_t x1, std::uint32_t y0) {
    std::string shape;
    for (std::uint32_t y = y0; y < picture.height; ++y) {
        for (std::uint32_t x = x0; x < x1; ++x) shape += IsInk(picture, x, y) ? '#' : '.';
        shape += '\n';
    }
    return shape;
}

TEST(Legend, ABarOfTheColoursStandsBelowThePicture) {
    const Picture picture = Legended({{"stretch", "0,10"}, {"colormap", "viridis"}});
    const Colormap map = *FindColormap("viridis");
    ASSERT_EQ(picture.channels, 3u);
    ASSERT_GT(picture.height, 10u + 16u);
    const std::size_t middle = 10 + 8 + 8;  // margin and half of the bar
    const auto at = [&](std::size_t x) { return &picture.bytes[(middle * picture.width + x) * 3]; };
    EXPECT_TRUE(std::equal(map.front().begin(), map.front().end(), at(8)));
    EXPECT_TRUE(std::equal(map.back().begin(), map.back().end(), at(400 - 9)));
    EXPECT_EQ(*at(2), 255) << "its margin is white";
    for (std::size_t x = 9; x < 390; ++x) EXPECT_GE(at(x + 1)[1], at(x)[1]) << "green only rises";
}

TEST(Legend, ThePictureAboveItStaysAsItIs) {
    MemoryPixels<float> source(2, 2, 1, {1, 2, 3, 4});
    const Renderer renderer(source.Facts(), Styled({{"stretch", "0,10"}}), source);
    const Picture plain = RenderWindow(renderer, source, {0, 0, 2, 2}, 40, 40);
    const Picture whole = WithLegend(plain, renderer);
    const Picture coloured = WithColours(plain);
    EXPECT_TRUE(std::equal(coloured.bytes.begin(), coloured.bytes.end(), whole.bytes.begin()));
    EXPECT_EQ(whole.width, 40u);
}

// The same digits make the same shapes, at both ends, and others make others.
TEST(Legend, TheBoundsStandUnderTheEndsOfTheBar) {
    const auto left = [](const Picture& picture) {
        return Shape(picture, 8, 8 + 5 * 12, picture.height - 8 - 14);
    };
    const auto right = [](const Picture& picture, std::uint32_t characters) {
        return Shape(picture, 400 - 8 - characters * 12 + 2, 400 - 8, picture.height - 8 - 14);
    };
    const auto first = [&](const std::string& low, std::uint32_t characters) {
        const Picture picture = Legended({{"stretch", low + ",777"}});
        return Shape(picture, 8, 8 + characters * 12 - 2, picture.height - 8 - 14);
    };
    const Picture picture = Legended({{"stretch", "-1.25,300"}});
    EXPECT_EQ(right(picture, 3), first("300", 3));
    EXPECT_NE(left(picture), left(Legended({{"stretch", "-1.35,300"}})));
    EXPECT_EQ(left(picture), left(Legended({{"stretch", "-1.25,500"}})));
    std::map<std::string, std::string> shapes;
    for (const char* digit : {"0", "1", "2", "3", "4", "5", "6", "7", "8", "9"})
        shapes[first(digit, 1)] += digit;
    EXPECT_EQ(shapes.size(), 10u) << "no two digits look alike";
    for (const auto& [shape, digits] : shapes) EXPECT_NE(shape.find('#'), shape.npos) << digits;
}

TEST(Legend, ItFitsPicturesOfEveryWidth) {
    for (const std::uint32_t width : {1u, 5u, 17u, 100u, 5000u}) {
        const Picture picture = Legended({{"stretch", "-123456789.5,1e300"}}, width);
        EXPECT_EQ(picture.bytes.size(), std::size_t{width} * picture.height * 3);
    }
}

TEST(Legend, AlphaAndSixteenBitsStay) {
    MemoryPixels<float> source(2, 1, 1, {1, std::nanf("")});
    const Renderer alpha(source.Facts(), Styled({{"stretch", "0,2"}}), source);
    const Picture picture = WithLegend(RenderWindow(alpha, source, {0, 0, 2, 1}, 2, 1), alpha);
    ASSERT_EQ(picture.channels, 4u);
    EXPECT_EQ(picture.bytes[3], 255);
    EXPECT_EQ(picture.bytes[7], 0);
    EXPECT_EQ(picture.bytes.back(), 255);
    const Picture wide = Legended({{"stretch", "0,4"}, {"depth", "16"}});
    EXPECT_EQ(wide.depth, 16u);
    EXPECT_EQ(wide.bytes.size(), wide.LineBytes() * wide.height);
}

TEST(Legend, ColoursOfThreeBandsHaveNone) {
    MemoryPixels<unsigned char> source(1, 1, 3, {1, 2, 3});
    const Renderer renderer(source.Facts(), {}, source);
    EXPECT_EQ(WithLegend({1, 1, 3, 8, {1, 2, 3}}, renderer).height, 1u);
}

}  // namespace
}  // namespace zmcrender
