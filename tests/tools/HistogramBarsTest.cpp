#include "tools/HistogramBars.h"

#include <gtest/gtest.h>

namespace zmctools {
namespace {

using Lines = std::vector<std::string>;

TEST(HistogramBars, TheHighestBarFillsAllLines) {
    EXPECT_EQ(DrawBars({0, 3, 6}), (Lines{"  █", "  █", "  █", " ██", " ██", " ██"}));
}

TEST(HistogramBars, WhatIsNotEmptyShows) {
    EXPECT_EQ(DrawBars({1e9, 1}).back(), "█▁");
    EXPECT_EQ(DrawBars({1e9, 0}).back(), "█ ");
}

TEST(HistogramBars, NeighboursAreGathered) {
    std::vector<double> counts(256, 1);
    for (int i = 0; i < 4; ++i) counts[static_cast<std::size_t>(i)] = 2;
    const Lines lines = DrawBars(counts);
    ASSERT_EQ(lines.size(), 6u);
    EXPECT_EQ(lines.front(), "█" + std::string(63, ' '));
}

TEST(HistogramBars, NothingIsDrawnOfNothing) {
    EXPECT_TRUE(DrawBars({}).empty());
    EXPECT_TRUE(DrawBars({0, 0}).empty());
}

}  // namespace
}  // namespace zmctools
