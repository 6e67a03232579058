#include "colour/ColorList.h"

#include <gtest/gtest.h>

#include <vector>

namespace zelm {
namespace {

TEST(ColorList, PacksFromTheLowByte) {
    constexpr ColorList::Rgba color = ColorList::Pack(1, 2, 3, 254);
    EXPECT_EQ(color, 0xFE030201u);
    EXPECT_EQ(ColorList::Channel(color, 0), 1);
    EXPECT_EQ(ColorList::Channel(color, 1), 2);
    EXPECT_EQ(ColorList::Channel(color, 2), 3);
    EXPECT_EQ(ColorList::Channel(color, 3), 254);
}

TEST(ColorList, MakesThePaletteThatTheSameStepsMake) {
    ColorList list;
    Palette palette;
    const auto add = [&](std::uint8_t red) {
        unsigned char channels[] = {red, 2, 3, 4};
        list.Add(ColorList::Pack(red, 2, 3, 4));
        palette.AddColor(RGBAColor(Array<unsigned char>(channels, ArrayShape(4))));
    };
    const auto lookUp = [&](std::uint32_t index) {
        list.LookUp(index);
        palette.GetColor(index);
    };
    lookUp(1);
    add(10);
    lookUp(0);
    lookUp(7);
    add(11);
    Palette made;
    list.CopyTo(made);
    EXPECT_EQ(made.nextIndex, palette.nextIndex);
    ASSERT_EQ(made.colors.size(), 3u);
    ASSERT_EQ(palette.colors.size(), 3u);
    for (const auto& [index, color] : palette.colors) {
        const Color& other = *made.colors.at(index);
        EXPECT_TRUE(other.name == color->name);
        EXPECT_EQ(other.red, color->red);
        EXPECT_EQ(other.alpha, color->alpha);
        EXPECT_EQ(other.isNull, color->isNull);
    }
}

TEST(ColorList, CopiesShareWhatTheyHoldAndGoTheirOwnWay) {
    ColorList list;
    list.Add(1);
    list.LookUp(9);
    const ColorList early = list;
    EXPECT_EQ(early.Colors().data(), list.Colors().data());
    ColorList other = list;
    list.Add(2);
    list.LookUp(7);
    EXPECT_EQ(early.Colors().data(), list.Colors().data());
    other.Add(3);
    other.LookUp(5);
    const auto show = [](const ColorList& each) {
        Palette made;
        each.CopyTo(made);
        std::vector<std::uint32_t> entries(each.Colors().begin(), each.Colors().end());
        for (const auto& [index, color] : made.colors)
            if (color->isNull) entries.push_back(index);
        return entries;
    };
    EXPECT_EQ(show(early), (std::vector<std::uint32_t>{1, 9}));
    EXPECT_EQ(show(list), (std::vector<std::uint32_t>{1, 2, 7, 9}));
    EXPECT_EQ(show(other), (std::vector<std::uint32_t>{1, 3, 5, 9}));
}

TEST(ColorList, ClearLeavesNothing) {
    ColorList list;
    list.Add(5);
    list.LookUp(9);
    list.Clear();
    Palette made;
    list.CopyTo(made);
    EXPECT_TRUE(list.Colors().empty());
    EXPECT_TRUE(made.colors.empty());
    EXPECT_EQ(made.nextIndex, 0u);
}

}  // namespace
}  // namespace zelm
