// The arithmetic of a build, with a pencil.
#include "host/build/BuildPlan.h"

#include <gtest/gtest.h>
#include <rapidcheck.h>
#include <rapidcheck/gtest.h>

namespace zmchost {
namespace {

TEST(BuildPlan, DefaultLevelsEndWithTheFirstThatFitsOneTile) {
    EXPECT_EQ(DefaultMaxLevel(256, 256, 3), 0u);
    EXPECT_EQ(DefaultMaxLevel(257, 1, 3), 0u);  // a second level would have no line
    EXPECT_EQ(DefaultMaxLevel(512, 512, 3), 1u);
    EXPECT_EQ(DefaultMaxLevel(514, 2, 3), 1u);
    EXPECT_EQ(DefaultMaxLevel(16384, 12288, 3), 6u);
    EXPECT_EQ(DefaultMaxLevel(1000, 777, 3), 2u);
}

TEST(BuildPlan, MortonLevelsEndAtEight) {
    EXPECT_EQ(DefaultMaxLevel(1000000, 1000000, 9), 8u);
    EXPECT_EQ(DefaultMaxLevel(1000000, 1000000, 8), 12u);
}

TEST(BuildPlan, StripMemoryIsThatOfItsRows) {
    EXPECT_EQ(StripMemory(1000, 0, 0, 3, 2), 2u * 256 * 1000 * 3);
    EXPECT_EQ(StripMemory(1000, 1, 0, 3, 3), (3u * 256 * 1000 + 2u * 256 * 500) * 3);
    EXPECT_EQ(StripMemory(1000, 1, 5, 1, 2), (2u * 256 + 12) * 1000 + 2u * 256 * 500);
}

TEST(BuildPlan, WideRasterGoesWholeWhereTheBudgetAllows) {
    const auto passes = PlanPasses({65536, 3072, 8, 0, 3, std::uint64_t{256} << 20});
    ASSERT_EQ(passes.size(), 1u);
    EXPECT_EQ(passes[0].columns.size(), 1u);
}

void ExpectSound(const PlanInput& input) {
    const auto passes = PlanPasses(input);
    RC_ASSERT(!passes.empty());
    std::uint32_t base = 0;
    for (const Pass& pass : passes) {
        RC_ASSERT(pass.baseLevel == base);
        RC_ASSERT(pass.topLevel > base || input.maxLevel == base);
        RC_ASSERT(pass.memory <= input.budget);
        const std::uint32_t levels = pass.topLevel - base;
        const std::uint64_t margin = std::uint64_t{input.halo} << levels;
        std::uint64_t end = 0;
        for (const Column& column : pass.columns) {
            RC_ASSERT(column.begin == end && column.end > column.begin);
            RC_ASSERT(column.begin % (std::uint64_t{kTileSide} << levels) == 0u);
            RC_ASSERT(column.readBegin + std::min<std::uint64_t>(margin, column.begin) ==
                      column.begin);
            RC_ASSERT(StripMemory(column.readEnd - column.readBegin, levels, input.halo,
                                  input.pixelBytes, pass.stripsAhead) <= input.budget);
            end = column.end;
        }
        RC_ASSERT(end == input.width >> base);
        base = pass.topLevel;
    }
    RC_ASSERT(base == input.maxLevel);
}

RC_GTEST_PROP(BuildPlan, PassesCoverEveryLevelOnceWithinTheBudget, ()) {
    PlanInput input;
    input.width = *rc::gen::inRange(1u, 3000000u);
    input.height = *rc::gen::inRange(1u, 3000000u);
    input.maxLevel = *rc::gen::inRange(0u, MaxLevelOf(input.width, input.height) + 1);
    input.halo = *rc::gen::element(0u, 1u, 3u, 5u);
    input.pixelBytes = *rc::gen::inRange(1u, 300u);
    input.budget = LeastMemory(input) + *rc::gen::inRange(0u, 500000000u);
    ExpectSound(input);
}

TEST(BuildPlan, NothingIsPlannedBelowTheLeastBudget) {
    PlanInput input{100000, 100000, 6, 5, 24, 0};
    input.budget = LeastMemory(input) - 1;
    EXPECT_TRUE(PlanPasses(input).empty());
    ++input.budget;
    EXPECT_FALSE(PlanPasses(input).empty());
}

}  // namespace
}  // namespace zmchost
