// Every way through a copy against a model that moves one byte at a time: sizes of samples,
// interleaves, odd widths, whole lines and parts of them, and lists of every kind.
#include "raster/TileCopy.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <utility>
#include <vector>

#include "core/PixelVocabulary.h"
#include "tests/support/TileModel.h"

namespace zmctest {

using namespace zelm;
namespace {

using Bytes = std::vector<unsigned char>;

constexpr std::size_t kGuard = 32;

Bytes Noise(std::size_t count, std::uint32_t seed) {
    Random random(seed);
    Bytes bytes(count);
    for (unsigned char& byte : bytes) byte = static_cast<unsigned char>(random.Between(0, 255));
    return bytes;
}

struct Copy {
    std::int32_t interleave;
    Box raster;
    TileWindow window;
    std::vector<int> list;
    std::size_t size;

    Box Tile() const { return {window.width, window.height, list.size()}; }
    RasterLayout Layout() const {
        return {interleave, static_cast<std::uint32_t>(raster.width),
                static_cast<std::uint32_t>(raster.height),
                static_cast<std::uint32_t>(raster.bands)};
    }
    TileBands Bands() const { return {list.data(), static_cast<std::uint32_t>(list.size())}; }

    // A buffer between guards; one byte off, so that no sample is aligned.
    Bytes Buffer(const Box& box, std::uint32_t seed) const {
        return Noise(box.Elements(interleave) * size + 2 * kGuard + 1, seed);
    }

    // Calls visit(place in the raster's buffer, place in the tile's) for every byte, in the order
    // of the list.
    template <class Visit>
    void ForEachByte(Visit&& visit) const {
        const bool plane = interleave == Interleave::None;
        for (std::size_t k = 0; k < (plane ? 1 : list.size()); ++k)
            for (std::size_t l = 0; l < window.height; ++l)
                for (std::size_t s = 0; s < window.width; ++s)
                    for (std::size_t i = 0; i < size; ++i)
                        visit(kGuard + 1 + i +
                                  size * raster.Index(interleave,
                                                      plane ? 0 : static_cast<std::size_t>(list[k]),
                                                      l + static_cast<std::size_t>(window.y),
                                                      s + static_cast<std::size_t>(window.x)),
                              kGuard + 1 + i + size * Tile().Index(interleave, k, l, s));
    }

    void ExpectToHold() const {
        const Bytes raster0 = Buffer(raster, 1), tile0 = Buffer(Tile(), 2);
        Bytes expectedTile = tile0, expectedRaster = raster0;
        ForEachByte([&](std::size_t inRaster, std::size_t inTile) {
            expectedTile[inTile] = raster0[inRaster];
            expectedRaster[inRaster] = tile0[inTile];
        });
        Bytes tile = tile0, back = raster0;
        CopyTileFromRaster(Layout(), window, Bands(), size, raster0.data() + kGuard + 1,
                           tile.data() + kGuard + 1);
        EXPECT_EQ(tile, expectedTile);
        CopyTileToRaster(Layout(), window, Bands(), size, back.data() + kGuard + 1,
                         tile0.data() + kGuard + 1);
        EXPECT_EQ(back, expectedRaster);
    }
};

class TileCopy : public ::testing::TestWithParam<std::size_t> {
protected:
    // All widths up to some steps of any loop, first and last columns and whole lines, one line and
    // several.
    void ExpectAllWindows(std::int32_t interleave, std::size_t bands, std::vector<int> list) const {
        SCOPED_TRACE(::testing::Message() << "interleave " << interleave << ", " << bands
                                          << " bands, list of " << list.size());
        Copy copy{interleave, {0, 4, bands}, {}, std::move(list), GetParam()};
        for (std::uint32_t width = 0; width <= 11; ++width) {
            for (const std::uint32_t margin : {0u, 3u}) {
                for (const std::uint32_t height : {0u, 1u, 3u, 4u}) {
                    copy.raster.width = std::max(1u, width + margin);
                    copy.window = {static_cast<int>(margin / 2), height == 3 ? 1 : 0, width,
                                   height};
                    copy.ExpectToHold();
                }
            }
        }
    }
};

INSTANTIATE_TEST_SUITE_P(SampleSizes, TileCopy, ::testing::Values(1, 2, 4, 8, 16));

TEST_P(TileCopy, MovesAllBandsInOrder) {
    for (const std::int32_t interleave : kInterleaves)
        for (const std::size_t bands : {1u, 2u, 3u, 5u})
            ExpectAllWindows(interleave, bands, AllBands(bands));
}

TEST_P(TileCopy, MovesOneToFourBandsOfAny) {
    for (const std::int32_t interleave : kInterleaves) {
        ExpectAllWindows(interleave, 3, {1});
        ExpectAllWindows(interleave, 3, {2, 0});
        ExpectAllWindows(interleave, 3, {2, 1, 0});
        ExpectAllWindows(interleave, 4, {0, 1, 2});
        ExpectAllWindows(interleave, 7, {5, 6, 1, 3});
    }
}

TEST_P(TileCopy, MovesMoreBandsThanOnePassTakes) {
    for (const std::int32_t interleave : kInterleaves) {
        ExpectAllWindows(interleave, 7, {6, 5, 4, 3, 2, 1, 0});
        ExpectAllWindows(interleave, 9, {0, 2, 3, 4, 8});
    }
}

TEST_P(TileCopy, MovesBlocksOfNeighbouringBands) {
    // 64 bytes and more for samples of any size, between bands that stand alone.
    std::vector<int> list{0};
    for (int band = 2; band < 70; ++band) list.push_back(band);
    list.push_back(1);
    for (const std::int32_t interleave : kInterleaves) ExpectAllWindows(interleave, 71, list);
}

TEST_P(TileCopy, BandNamedTwiceTakesTheLastValues) {
    for (const std::int32_t interleave : kInterleaves) {
        ExpectAllWindows(interleave, 3, {1, 1});
        ExpectAllWindows(interleave, 3, {0, 1, 2, 0, 1, 2});
        ExpectAllWindows(interleave, 2, {1, 0, 1, 0, 1, 1});
    }
}

TEST_P(TileCopy, EmptyListAndEmptyWindowNeedNoBuffers) {
    for (const std::int32_t interleave : {Interleave::BIP, Interleave::BIL, Interleave::BSQ}) {
        const RasterLayout layout{interleave, 2, 2, 1};
        const int band = 0;
        CopyTileFromRaster(layout, {0, 0, 2, 2}, {nullptr, 0}, GetParam(), nullptr, nullptr);
        CopyTileToRaster(layout, {0, 0, 0, 2}, {&band, 1}, GetParam(), nullptr, nullptr);
        CopyTileToRaster(layout, {0, 0, 2, 0}, {&band, 1}, GetParam(), nullptr, nullptr);
    }
}

TEST_P(TileCopy, SinglePlaneNeedsNoList) {
    const Bytes raster = Noise(6 * GetParam(), 1);
    Bytes tile(raster.size());
    CopyTileFromRaster({Interleave::None, 3, 2, 9}, {0, 0, 3, 2}, {nullptr, 0}, GetParam(),
                       raster.data(), tile.data());
    EXPECT_EQ(tile, raster);
}

}  // namespace
}  // namespace zmctest
