#include "format/Rectangle.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <set>
#include <tuple>
#include <vector>

#include "format/TileWalk.h"

namespace zelm {

std::ostream& operator<<(std::ostream& stream, const Rectangle& r) {
    return stream << r.width << " x " << r.height << " at " << r.x << ", " << r.y;
}

namespace {

constexpr std::uint32_t kMost = 0xFFFFFFFF;

TEST(RectangleTest, PartsInCommon) {
    EXPECT_EQ(Intersection({2, 3, 10, 10}, {5, 1, 100, 4}), (Rectangle{5, 3, 7, 2}));
    EXPECT_EQ(Intersection({2, 3, 10, 10}, {2, 3, 10, 10}), (Rectangle{2, 3, 10, 10}));
    for (const Rectangle other : {Rectangle{12, 3, 5, 5},
                                  {2, 13, 5, 5},
                                  {0, 3, 2, 9},
                                  {2, 0, 9, 3},
                                  {4, 4, 0, 5},
                                  {4, 4, 5, 0},
                                  {40, 40, 1, 1}}) {
        EXPECT_TRUE(Intersection({2, 3, 10, 10}, other).IsEmpty()) << other;
        EXPECT_TRUE(Intersection(other, {2, 3, 10, 10}).IsEmpty()) << other;
    }
}

TEST(RectangleTest, PartsInCommonAtTheEndOf32Bits) {
    const Rectangle all{0, 0, kMost, kMost}, last{kMost, kMost, kMost, kMost};
    EXPECT_TRUE(Intersection(all, last).IsEmpty());
    EXPECT_EQ(Intersection({kMost - 5, 0, kMost, 7}, {kMost - 3, 2, 9, kMost}),
              (Rectangle{kMost - 3, 2, 9, 5}));
    EXPECT_EQ(last.Right(), 8589934590u);
    EXPECT_EQ(last.Bottom(), 8589934590u);
    EXPECT_EQ(all.Pixels(), 18446744065119617025u);
    EXPECT_FALSE(all.Contains(last));
    EXPECT_FALSE(all.Contains({1, 0, kMost, 1}));
    EXPECT_FALSE(all.Contains({0, 1, 1, kMost}));
    EXPECT_TRUE(all.Contains(all));
}

TEST(RectangleTest, WhatLiesInside) {
    const Rectangle whole{2, 3, 10, 20};
    EXPECT_TRUE(whole.Contains({2, 3, 10, 20}));
    EXPECT_TRUE(whole.Contains({5, 6, 1, 1}));
    EXPECT_TRUE(whole.Contains({12, 23, 0, 0}));
    for (const Rectangle outside : {Rectangle{1, 3, 10, 20},
                                    {2, 2, 10, 20},
                                    {2, 3, 11, 20},
                                    {2, 3, 10, 21},
                                    {13, 3, 0, 0},
                                    {2, 24, 0, 0}})
        EXPECT_FALSE(whole.Contains(outside)) << outside;
    EXPECT_TRUE((Rectangle{1, 1, 0, 5}).IsEmpty());
    EXPECT_TRUE((Rectangle{1, 1, 5, 0}).IsEmpty());
    EXPECT_FALSE((Rectangle{1, 1, 1, 1}).IsEmpty());
}

TEST(RectangleTest, EveryMemberCountsInAComparison) {
    const Rectangle one{2, 3, 10, 20};
    EXPECT_EQ(one, (Rectangle{2, 3, 10, 20}));
    for (const Rectangle other :
         {Rectangle{1, 3, 10, 20}, {2, 2, 10, 20}, {2, 3, 11, 20}, {2, 3, 10, 21}})
        EXPECT_FALSE(one == other) << other;
}

// --- the walk over tiles ---

TEST(TileWalk, TilesFromTheTopAndFromTheLeft) {
    const LevelGeometry level(1000, 777, 256, 0);
    std::vector<TilePart> parts;
    EXPECT_TRUE(VisitTiles(level, {250, 500, 300, 277},
                           [&](const TilePart& part) { parts.push_back(part); }));
    ASSERT_EQ(parts.size(), 9u);
    EXPECT_EQ(parts[0].column, 0u);
    EXPECT_EQ(parts[0].row, 1u);
    EXPECT_EQ(parts[0].tile, (Rectangle{0, 256, 256, 256}));
    EXPECT_EQ(parts[0].part, (Rectangle{250, 500, 6, 12}));
    EXPECT_EQ(parts[0].FirstColumn(), 250u);
    EXPECT_EQ(parts[0].FirstLine(), 244u);
    EXPECT_EQ(parts[1].column, 1u);
    EXPECT_EQ(parts[3].row, 2u);
    EXPECT_EQ(parts[8].tile, (Rectangle{512, 768, 256, 9}));
    EXPECT_EQ(parts[8].part, (Rectangle{512, 768, 38, 9}));
}

TEST(TileWalk, EndsWhereAVisitorSaysSo) {
    const LevelGeometry level(1000, 777, 256, 0);
    int visits = 0;
    EXPECT_FALSE(VisitTiles(level, level.Whole(), [&](const TilePart&) { return ++visits < 5; }));
    EXPECT_EQ(visits, 5);
    EXPECT_TRUE(VisitTiles(level, level.Whole(), [&](const TilePart&) { return true; }));
}

TEST(TileWalk, NothingToVisit) {
    const auto visit = [](const TilePart&) { ADD_FAILURE(); };
    const LevelGeometry level(1000, 777, 256, 0);
    for (const Rectangle none : {Rectangle{},
                                 {3, 3, 0, 5},
                                 {3, 3, 5, 0},
                                 {1000, 0, 5, 5},
                                 {0, 777, 5, 5},
                                 {kMost, kMost, kMost, kMost}})
        EXPECT_TRUE(VisitTiles(level, none, visit)) << none;
    EXPECT_TRUE(VisitTiles(LevelGeometry(1000, 777, 0, 0), {0, 0, 5, 5}, visit));
    EXPECT_TRUE(VisitTiles(LevelGeometry(1000, 777, 256, 10), {0, 0, 5, 5}, visit));
}

// The count of tiles has wrapped there, and the last pixel is the last of 32 bits.
TEST(TileWalk, AtTheEndOf32Bits) {
    const LevelGeometry level(kMost, kMost, 2048, 0);
    std::vector<TilePart> parts;
    VisitTiles(level, {kMost - 1, kMost - 2049, kMost, kMost},
               [&](const TilePart& part) { parts.push_back(part); });
    ASSERT_EQ(parts.size(), 2u);
    EXPECT_EQ(parts[1].tile, (Rectangle{kMost - 2047, kMost - 2047, 2047, 2047}));
    EXPECT_EQ(parts[1].part, (Rectangle{kMost - 1, kMost - 2047, 1, 2047}));
    EXPECT_EQ(parts[0].part, (Rectangle{kMost - 1, kMost - 2049, 1, 2}));
}

// The parts cover the rectangle, each pixel once, each in its own tile.
RC_GTEST_PROP(TileWalk, CoversTheRectangleOnce, ()) {
    const auto width = *rc::gen::inRange(1u, 60u), height = *rc::gen::inRange(1u, 60u);
    const LevelGeometry level(width, height, *rc::gen::inRange(1u, 70u), 0);
    const auto x = *rc::gen::inRange(0u, width), y = *rc::gen::inRange(0u, height);
    const Rectangle asked{x, y, *rc::gen::inRange(1u, width - x + 1),
                          *rc::gen::inRange(1u, height - y + 1)};
    std::set<std::tuple<std::uint32_t, std::uint32_t>> pixels;
    VisitTiles(level, asked, [&](const TilePart& part) {
        RC_ASSERT(level.HasTile(part.column, part.row));
        RC_ASSERT(part.tile.x == part.column * level.tileSize);
        RC_ASSERT(part.tile.width == level.TileWidth(part.column));
        RC_ASSERT(part.tile.height == level.TileHeight(part.row));
        RC_ASSERT(part.tile.Contains(part.part) && asked.Contains(part.part));
        for (std::uint32_t line = part.part.y; line < part.part.Bottom(); ++line)
            for (std::uint32_t column = part.part.x; column < part.part.Right(); ++column)
                RC_ASSERT(pixels.emplace(column, line).second);
    });
    RC_ASSERT(pixels.size() == asked.Pixels());
}

}  // namespace
}  // namespace zelm
