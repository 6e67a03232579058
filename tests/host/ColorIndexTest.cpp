#include "host/reduce/ColorIndex.h"

#include <gtest/gtest.h>

#include <random>
#include <thread>

#include "tests/host/Palettes.h"

namespace {

using zmchost::ColorIndex;
using zmchost::Rgba;
using zmctest::PaletteOf;

bool Any(std::uint32_t) { return true; }

std::uint32_t Nearest(const std::vector<Rgba>& colors, const Rgba& wanted) {
    std::uint32_t best = 0;
    int least = 1 << 30;
    for (std::uint32_t i = 0; i < colors.size(); ++i) {
        int distance = 0;
        for (std::size_t k = 0; k < 4; ++k)
            distance += (colors[i][k] - wanted[k]) * (colors[i][k] - wanted[k]);
        if (distance < least) {
            least = distance;
            best = i;
        }
    }
    return best;
}

std::vector<Rgba> AnyColors(std::size_t count, unsigned range, unsigned seed) {
    std::mt19937 random(seed);
    std::vector<Rgba> colors(count);
    for (Rgba& color : colors)
        for (std::uint8_t& part : color) part = static_cast<std::uint8_t>(random() % range);
    return colors;
}

TEST(ColorIndex, FindsTheNearestEntryAndTheLowestOfSeveral) {
    for (const std::size_t count : {1u, 2u, 9u, 256u, 5000u}) {
        for (const unsigned range : {2u, 8u, 256u}) {
            const auto colors = AnyColors(count, range, static_cast<unsigned>(count));
            const auto palette = PaletteOf(colors);
            const ColorIndex index(*palette, Any);
            for (const Rgba& wanted : AnyColors(400, 256, range)) {
                const std::uint32_t expected = Nearest(colors, wanted);
                ASSERT_EQ(index.Nearest(wanted), expected) << count << " of " << range;
                ASSERT_EQ(index.Nearest(wanted), expected) << "asked again";
            }
        }
    }
}

TEST(ColorIndex, ThousandsOfEqualColoursAnswerWithTheFirst) {
    const ColorIndex index(*PaletteOf(std::vector<Rgba>(60000, Rgba{9, 9, 9, 255})), Any);
    EXPECT_EQ(index.Nearest({0, 255, 0, 0}), 0u);
    EXPECT_EQ(*index.Find(59999), (Rgba{9, 9, 9, 255}));
    EXPECT_EQ(index.Find(60000), nullptr);
}

TEST(ColorIndex, OnlyEntriesThatMayBeNamedAreAnswers) {
    const auto palette = PaletteOf({{0, 0, 0, 255}, {50, 0, 0, 255}, {0, 0, 0, 255}});
    const ColorIndex index(*palette, [](std::uint32_t i) { return i != 0; });
    EXPECT_EQ(index.Nearest({1, 0, 0, 255}), 2u);
    EXPECT_EQ(*index.Find(0), (Rgba{0, 0, 0, 255}));
    EXPECT_FALSE(ColorIndex(*palette, [](std::uint32_t) { return false; }).Nearest({}));
}

TEST(ColorIndex, EntriesWithoutAColourHaveNone) {
    const auto palette = PaletteOf({{1, 1, 1, 255}, {2, 2, 2, 255}, {3, 3, 3, 255}});
    palette->colors[1] = zelm::ColorPtr();
    palette->colors[7];  // behind the end
    palette->GetColor(2)->isNull = 1;
    const ColorIndex index(*palette, Any);
    EXPECT_NE(index.Find(0), nullptr);
    for (const std::uint64_t i :
         {std::uint64_t{1}, std::uint64_t{2}, std::uint64_t{7}, std::uint64_t{1} << 40})
        EXPECT_EQ(index.Find(i), nullptr);
    EXPECT_EQ(index.Nearest({3, 3, 3, 255}), 0u);
    EXPECT_FALSE(ColorIndex(zelm::Palette(), Any).Nearest({}));
}

TEST(ColorIndex, ThreadsGetTheSameAnswers) {
    const auto colors = AnyColors(3000, 256, 4);
    const auto palette = PaletteOf(colors);
    const ColorIndex index(*palette, Any);
    const auto wanted = AnyColors(20000, 256, 5);
    std::vector<std::vector<std::uint32_t>> answers(2);
    std::vector<std::thread> threads;
    for (auto& mine : answers)
        threads.emplace_back([&] {
            for (const Rgba& color : wanted) mine.push_back(*index.Nearest(color));
        });
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(answers[0], answers[1]);
    for (std::size_t i = 0; i < wanted.size(); i += 100)
        EXPECT_EQ(answers[0][i], Nearest(colors, wanted[i]));
}

}  // namespace
