// Colour maps are those of the file that the viewer reads too.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <string>

#include "render/Colormaps.h"

namespace zmcrender {
namespace {

std::string TextOf(const Colormap& map) {
    std::string text;
    for (const auto& colour : map)
        for (const unsigned char part : colour) {
            char digits[3];
            static_cast<void>(std::snprintf(digits, sizeof digits, "%02x", part));
            text += digits;
        }
    return text;
}

TEST(Colormaps, AreThoseOfTheFile) {
    std::ifstream file(ZMC_COLORMAPS_FILE);
    std::size_t maps = 0;
    for (std::string line; std::getline(file, line);) {
        if (line.starts_with('#')) continue;
        const std::size_t blank = line.find(' ');
        const auto map = FindColormap(line.substr(0, blank));
        ASSERT_TRUE(map) << line.substr(0, blank);
        EXPECT_EQ(TextOf(*map), line.substr(blank + 1));
        EXPECT_EQ(ColormapNames()[maps++], line.substr(0, blank));
    }
    EXPECT_EQ(maps, ColormapNames().size());
    for (const char* name : {"grey", "viridis", "magma", "inferno", "plasma", "cividis", "turbo"})
        EXPECT_TRUE(FindColormap(name)) << name;
}

TEST(Colormaps, AMinusReverses) {
    auto map = *FindColormap("viridis");
    std::reverse(map.begin(), map.end());
    EXPECT_EQ(*FindColormap("-viridis"), map);
}

TEST(Colormaps, GreyIsTheLevelItself) {
    const auto map = *FindColormap("grey");
    for (unsigned i = 0; i < 256; ++i)
        for (const unsigned part : map[i]) EXPECT_EQ(part, i);
}

TEST(Colormaps, OtherNamesAreNone) {
    for (const char* name : {"", "-", "--grey", "Grey", "grey ", "jet", "palette"})
        EXPECT_FALSE(FindColormap(name)) << name;
}

}  // namespace
}  // namespace zmcrender
