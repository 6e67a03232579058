// Requests that need more work space or a larger table than there is memory for: refused whole, and
// answered as soon as there is.
#include <gtest/gtest.h>

#include "tests/support/AllocationFaults.h"
#include "tests/support/PyramidFileTest.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/PyramidModel.h"
#include "tests/support/ScratchDirectory.h"

namespace zmctest {
namespace {

class LargeFileFaultsTest : public PyramidFileTest {
protected:
    // Pixels of so many bands that a row of a tile does not fit in the work space, or a pixel.
    static PyramidDescription Wide(std::uint32_t bands) {
        PyramidDescription d;
        d.samples = 9;
        d.lines = 7;
        d.bands = bands;
        d.tile = 4;
        d.type = 12;
        d.ordering = 1;
        return d;
    }
    // Runs `call` while no memory can be had.
    template <class Call>
    static bool WithoutMemory(Call&& call) {
        AllocationFaults faults(1, FaultMode::FromThenOn);
        const bool result = call();
        faults.Disarm();
        EXPECT_NE(faults.Failed(), 0u);
        return result;
    }
};

TEST_F(LargeFileFaultsTest, RowsBeyondTheWorkSpace) {
    PyramidModel model(Wide(20000));
    model.StoreAllImages();
    model.Save(path);
    const std::string before = zmctest::ReadText(path.string());
    const BandList some({5, 2});
    const auto dataset = Open();
    ASSERT_TRUE(dataset);
    std::uint16_t pixels[] = {1, 2, 3, 4};
    const auto merge = [&] {
        return dataset->WriteTileInterleaved(1, 1, 2, 1, some.View(), 0, pixels);
    };
    const auto read = [&] { return dataset->ReadTile(1, 1, 2, 1, some.View(), 0, pixels); };
    EXPECT_FALSE(WithoutMemory(merge));
    EXPECT_TRUE(zmctest::ReadText(path.string()) == before);
    EXPECT_FALSE(WithoutMemory(read));
    EXPECT_EQ(pixels[0], 1);
    EXPECT_TRUE(merge());
    pixels[0] = 0;
    EXPECT_TRUE(read());
    EXPECT_EQ(pixels[0], 1);
}

// Some bands of what stands in its exact place, here a part of the last row of tiles, go behind it.
TEST_F(LargeFileFaultsTest, PixelsBeyondTheWorkSpace) {
    PyramidModel model(Wide(70000));
    model.StoreAllImages();
    model.Save(path);
    const std::string before = zmctest::ReadText(path.string());
    const BandList some({5, 2});
    const auto dataset = Open();
    ASSERT_TRUE(dataset);
    const std::uint16_t pixels[] = {1, 2, 3, 4, 5, 6};
    const auto write = [&] {
        return dataset->WriteTileInterleaved(2, 4, 1, 3, some.View(), 0, pixels);
    };
    EXPECT_FALSE(WithoutMemory(write));
    EXPECT_TRUE(zmctest::ReadText(path.string()) == before);
    EXPECT_TRUE(write());
    EXPECT_FALSE(zmctest::ReadText(path.string()) == before);
}

// The table of a large grid is made at the first request for a tile.
TEST_F(LargeFileFaultsTest, ATileTableWithoutMemory) {
    PyramidDescription d;
    d.samples = d.lines = 128;
    d.bands = d.tile = 1;
    d.type = 1;
    d.ordering = 2;
    PyramidModel model(d);
    model.StoreAllImages();
    model.Save(path);
    const BandList band({0});
    const auto dataset = Open();
    ASSERT_TRUE(dataset);
    ASSERT_EQ(dataset->TileOffsets.data, nullptr);
    unsigned char pixel = 0xA5;
    const auto read = [&] { return dataset->ReadTile(127, 5, 1, 1, band.View(), 0, &pixel); };
    EXPECT_FALSE(WithoutMemory(read));
    EXPECT_EQ(pixel, 0xA5);
    EXPECT_TRUE(read());
    EXPECT_EQ(Bytes{pixel}, model.ReadTile(127, 5, 1, 1, {0}, 0));
}

}  // namespace
}  // namespace zmctest
