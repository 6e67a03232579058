// Samples between planes of bands and whole pixels, beside the plainest of loops: every sample
// size, every number of bands around the powers of two, rows of any length, and no byte beside.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <numeric>
#include <random>
#include <vector>

#include "pyramid/TileGather.h"

namespace zmctest {
namespace {

using Bytes = std::vector<unsigned char>;

// How the samples of a block lie in memory of their own, which has no byte more than it needs.
struct Layout {
    std::size_t start, rowStep, pixelStep, bandStep, bytes;
    std::size_t At(std::uint32_t row, std::uint32_t column, std::size_t band) const {
        return start + row * rowStep + column * pixelStep + band * bandStep;
    }
};

struct Block {
    std::uint32_t rows, columns, bands, sampleBytes;

    // A plane for each band, with `gap` bytes between planes.
    Layout Planes(std::size_t gap) const {
        const std::size_t rowStep = std::size_t{columns} * sampleBytes;
        const std::size_t bandStep = rows * rowStep + gap;
        return {0, rowStep, sampleBytes, bandStep, bandStep * bands - gap};
    }
    // Whole pixels, with samples of so many other bands before and behind the block's.
    Layout Pixels(std::size_t before, std::size_t behind) const {
        const std::size_t pixelStep = (before + bands + behind) * sampleBytes;
        const std::size_t rowStep = columns * pixelStep;
        return {before * sampleBytes, rowStep, pixelStep, sampleBytes,
                rows * rowStep - behind * sampleBytes};
    }

    // What MoveSamples has to leave in `target`.
    void MovePlainly(const Bytes& source, const Layout& from, Bytes& target, const Layout& to,
                     const std::vector<int>& list) const {
        for (std::uint32_t row = 0; row < rows; ++row)
            for (std::uint32_t column = 0; column < columns; ++column)
                for (std::uint32_t band = 0; band < bands; ++band)
                    std::memcpy(
                        &target.at(to.At(row, column, band)),
                        &source.at(from.At(row, column, static_cast<std::size_t>(list[band]))),
                        sampleBytes);
    }

    void ExpectMoved(const Layout& from, const Layout& to, const std::vector<int>* list) const {
        std::mt19937 random(rows + 7 * columns + 31 * bands + 1009 * sampleBytes);
        Bytes source(from.bytes), target(to.bytes);
        for (Bytes* const bytes : {&source, &target})
            std::generate(bytes->begin(), bytes->end(),
                          [&] { return static_cast<unsigned char>(random()); });
        std::vector<int> all(bands);
        std::iota(all.begin(), all.end(), 0);
        Bytes expected = target;
        MovePlainly(source, from, expected, to, list ? *list : all);
        zelm::MoveSamples({source.data() + from.start, from.rowStep, from.pixelStep, from.bandStep,
                           list ? list->data() : nullptr},
                          {target.data() + to.start, to.rowStep, to.pixelStep, to.bandStep}, rows,
                          columns, bands, sampleBytes);
        ASSERT_TRUE(target == expected)
            << rows << " x " << columns << ", " << bands << " bands of " << sampleBytes << " bytes";
    }

    void ExpectMovedBothWays(const Layout& one, const Layout& other) const {
        ExpectMoved(one, other, nullptr);
        ExpectMoved(other, one, nullptr);
    }
};

class TileGather : public testing::TestWithParam<std::uint32_t> {
protected:
    // Calls visit(Block) for blocks around all lengths at which a way of moving ends.
    template <class Visit>
    void ForBlocks(Visit visit) {
        for (const std::uint32_t bands :
             {1u, 2u, 3u, 4u, 5u, 7u, 8u, 9u, 12u, 15u, 16u, 17u, 24u, 35u})
            for (const std::uint32_t columns : {1u, 3u, 4u, 8u, 15u, 16u, 17u, 33u}) {
                visit(Block{2, columns, bands, GetParam()});
                if (testing::Test::HasFatalFailure()) return;
            }
    }
};

TEST_P(TileGather, PlanesAndPackedPixels) {
    ForBlocks(
        [](const Block& block) { block.ExpectMovedBothWays(block.Planes(0), block.Pixels(0, 0)); });
}

TEST_P(TileGather, PlanesApartAndPackedPixels) {
    ForBlocks(
        [](const Block& block) { block.ExpectMovedBothWays(block.Planes(5), block.Pixels(0, 0)); });
}

TEST_P(TileGather, LeavesOtherBandsOfAPixelAsTheyWere) {
    ForBlocks([](const Block& block) {
        block.ExpectMovedBothWays(block.Planes(3), block.Pixels(2, 0));
        block.ExpectMovedBothWays(block.Planes(0), block.Pixels(0, 1));
        block.ExpectMovedBothWays(block.Planes(0), block.Pixels(3, 20));
    });
}

TEST_P(TileGather, PixelsOfOtherWidth) {
    ForBlocks([](const Block& block) {
        block.ExpectMovedBothWays(block.Pixels(1, 2), block.Pixels(0, 0));
        block.ExpectMovedBothWays(block.Pixels(0, 2), block.Pixels(3, 1));
    });
}

TEST_P(TileGather, ListOfBands) {
    ForBlocks([](const Block& block) {
        std::vector<int> list(block.bands);
        std::iota(list.rbegin(), list.rend(), 0);
        list.front() = list.back();
        block.ExpectMoved(block.Pixels(0, 0), block.Pixels(0, 0), &list);
        block.ExpectMoved(block.Planes(0), block.Pixels(1, 0), &list);
    });
}

INSTANTIATE_TEST_SUITE_P(SampleBytes, TileGather, testing::Values(1u, 2u, 4u, 8u, 16u),
                         testing::PrintToStringParamName());

}  // namespace
}  // namespace zmctest
