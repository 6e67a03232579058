#include "colour/Palette.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <array>
#include <map>
#include <optional>
#include <string>
#include <vector>

namespace zelm {
namespace {

RGBAColor Rgba(unsigned char r, unsigned char g, unsigned char b, unsigned char a) {
    unsigned char bytes[4] = {r, g, b, a};
    return RGBAColor(Array<unsigned char>(bytes, ArrayShape(4)));
}

using Bytes = std::array<int, 5>;
Bytes BytesOf(const Color& c) { return {c.red, c.green, c.blue, c.alpha, c.isNull}; }

TEST(Color, DefaultIsTheNullColour) {
    const Color color;
    EXPECT_TRUE(color.name == "null");
    EXPECT_EQ(BytesOf(color), (Bytes{0, 0, 0, 0, 1}));
}

TEST(Color, FromFourBytes) {
    const RGBAColor color = Rgba(1, 2, 3, 4);
    EXPECT_TRUE(color.name == "NoName");
    EXPECT_EQ(BytesOf(color), (Bytes{1, 2, 3, 4, 0}));
    const Color copy(color);
    EXPECT_TRUE(copy.name == "NoName");
    EXPECT_EQ(BytesOf(copy), BytesOf(color));
}

TEST(Color, MissingBytesCountAsZero) {
    EXPECT_EQ(BytesOf(RGBAColor(Array<unsigned char>())), (Bytes{0, 0, 0, 0, 0}));
    unsigned char bytes[2] = {9, 8};
    EXPECT_EQ(BytesOf(RGBAColor(Array<unsigned char>(bytes, ArrayShape(2)))),
              (Bytes{9, 8, 0, 0, 0}));
}

TEST(Color, AssigningToItselfKeepsTheName) {
    RGBAColor color = Rgba(1, 2, 3, 4);
    color.Assign(color);
    EXPECT_TRUE(color.name == "NoName");
}

TEST(Palette, LookupMakesANullColourAndLeavesTheLength) {
    Palette palette;
    const Color* color = palette.GetColor(5);
    ASSERT_NE(color, nullptr);
    EXPECT_TRUE(color->name == "null");
    EXPECT_EQ(color->isNull, 1);
    EXPECT_EQ(palette.colors.count(5), 1u);
    EXPECT_EQ(palette.colors.size(), 1u);
    EXPECT_EQ(palette.nextIndex, 0u);
    EXPECT_EQ(palette.GetColor(5), color);
}

TEST(Palette, ThreeColoursStandAtZeroOneAndTwo) {
    Palette palette;
    for (unsigned char i = 0; i < 3; ++i) palette.AddColor(Rgba(i, 0, 0, 255));
    EXPECT_EQ(palette.nextIndex, 3u);
    for (std::uint32_t i = 0; i < 3; ++i) EXPECT_EQ(palette.GetColor(i)->red, i);
}

TEST(Palette, AddColorReplacesWhatStandsThere) {
    Palette palette;
    palette.SetColor(0, Rgba(9, 9, 9, 9));
    const ColorPtr old(palette.colors[0]);
    palette.AddColor(Rgba(1, 1, 1, 1));
    EXPECT_EQ(palette.GetColor(0)->red, 1);
    EXPECT_EQ(old->red, 9);
}

TEST(Palette, SetBeyondTheLengthIsCarriedOver) {
    Palette palette;
    for (int i = 0; i < 3; ++i) palette.AddColor(Rgba(1, 1, 1, 1));
    palette.SetColor(7, Rgba(7, 7, 7, 7));
    EXPECT_EQ(palette.nextIndex, 3u);
    Palette target;
    target.AddColor(Rgba(2, 2, 2, 2));
    target.SetColor(20, Rgba(2, 2, 2, 2));
    palette.CopyTo(target);
    EXPECT_EQ(target.nextIndex, 3u);
    EXPECT_EQ(target.colors.size(), 4u);
    EXPECT_EQ(target.GetColor(7)->red, 7);
    EXPECT_NE(target.GetColor(7), palette.GetColor(7));
}

TEST(Palette, CopyDropsEmptyEntriesAndLookupMakesThemAgain) {
    Palette palette;
    palette.colors[4];
    palette.AddColor(Rgba(1, 1, 1, 1));
    Palette target;
    palette.CopyTo(target);
    EXPECT_EQ(target.colors.count(4), 0u);
    EXPECT_EQ(target.GetColor(4)->isNull, 1);
}

TEST(Palette, CopyToItselfKeepsAll) {
    Palette palette;
    palette.AddColor(Rgba(1, 2, 3, 4));
    palette.CopyTo(palette);
    EXPECT_EQ(palette.nextIndex, 1u);
    EXPECT_EQ(palette.GetColor(0)->green, 2);
}

TEST(Palette, SetKeepsTheIdentityOfTheColour) {
    Palette palette;
    const Color* const color = palette.GetColor(3);
    palette.SetColor(3, Rgba(5, 6, 7, 8));
    EXPECT_EQ(palette.GetColor(3), color);
    EXPECT_TRUE(color->name == "NoName");
    EXPECT_EQ(BytesOf(*color), (Bytes{5, 6, 7, 8, 0}));
    palette.SetColor(3, *color);
    EXPECT_TRUE(color->name == "NoName");
}

TEST(Palette, ClearTwice) {
    Palette palette;
    palette.AddColor(Color());
    palette.Clear();
    palette.Clear();
    EXPECT_EQ(palette.nextIndex, 0u);
    EXPECT_TRUE(palette.colors.empty());
}

// A palette as a map of optional colours, by their five bytes.
struct Model {
    std::map<std::uint32_t, std::optional<Bytes>> colors;
    std::uint32_t nextIndex = 0;
};

void ExpectSame(const Palette& palette, const Model& model) {
    RC_ASSERT(palette.nextIndex == model.nextIndex);
    RC_ASSERT(palette.colors.size() == model.colors.size());
    auto expected = model.colors.begin();
    for (const auto& [index, color] : palette.colors) {
        RC_ASSERT(index == expected->first);
        RC_ASSERT(static_cast<bool>(color) == expected->second.has_value());
        if (color) RC_ASSERT(BytesOf(*color) == *expected->second);
        ++expected;
    }
}

RC_GTEST_PROP(PaletteProperty, BehavesAsAMap, ()) {
    Palette palette;
    Model model;
    const auto steps = *rc::gen::container<std::vector<std::pair<int, std::uint32_t>>>(
        rc::gen::pair(rc::gen::inRange(0, 12), rc::gen::inRange<std::uint32_t>(0, 9)));
    for (const auto& [step, index] : steps) {
        const auto byte = static_cast<unsigned char>(*rc::gen::inRange(0, 256));
        const Bytes bytes{byte, 1, 2, 3, 0};
        if (step < 3) {
            palette.AddColor(Rgba(byte, 1, 2, 3));
            model.colors[model.nextIndex++] = bytes;
        } else if (step < 6) {
            palette.SetColor(index, Rgba(byte, 1, 2, 3));
            model.colors[index] = bytes;
        } else if (step < 9) {
            std::optional<Bytes>& entry = model.colors[index];
            if (!entry) entry = Bytes{0, 0, 0, 0, 1};
            RC_ASSERT(BytesOf(*palette.GetColor(index)) == *entry);
        } else if (step == 9) {
            palette.colors[index].Reset();
            model.colors[index].reset();
        } else if (step == 10) {
            palette.Clear();
            model = {};
        }
        ExpectSame(palette, model);
        Palette copy;
        palette.CopyTo(copy);
        Model copied = model;
        std::erase_if(copied.colors, [](const auto& entry) { return !entry.second; });
        ExpectSame(copy, copied);
    }
}

}  // namespace
}  // namespace zelm
