// Files whose pixels have very many bands: a row of a tile, or one pixel, is larger than any work
// space should be.
#include <gtest/gtest.h>

#include <random>

#include "tests/support/MemoryMeter.h"
#include "tests/support/PyramidFileTest.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/PyramidModel.h"

namespace zmctest {
namespace {

class WidePixelTest : public PyramidFileTest {
protected:
    // Most memory that `call` has in use.
    template <class Call>
    static std::int64_t PeakOf(Call&& call) {
        MemoryMeter::Reset();
        MemoryMeter::Switch(true);
        call();
        MemoryMeter::Switch(false);
        return MemoryMeter::Peak();
    }

    static PyramidDescription Wide(std::uint32_t bands, std::uint32_t tile) {
        PyramidDescription d;
        d.samples = 9;
        d.lines = 7;
        d.bands = bands;
        d.tile = tile;
        d.type = 12;
        d.ordering = 1;
        return d;
    }

    struct Rect {
        std::uint32_t x, y, width, height;
    };
    static constexpr Rect kRects[] = {{0, 0, 1, 1}, {8, 6, 1, 1}, {1, 1, 5, 3},
                                      {3, 0, 2, 7}, {0, 0, 9, 7}, {4, 4, 4, 3}};
    static std::vector<std::vector<int>> Lists(std::uint32_t bands) {
        const int last = static_cast<int>(bands) - 1;
        return {{0}, {last, 0}, {7, last / 2, 7}};
    }
};

constexpr std::int64_t kLittle = std::int64_t{2} << 20;

// A header of some hundred bytes may claim two thousand million bands. A tile of one pixel has 4
// GiB then, and of those one sample is asked for.
TEST_F(WidePixelTest, OneSampleOfAHugePixelTakesLittle) {
    zmctest::HeaderText header;
    header.bands = 2147483647;
    header.tileSize = 1;
    header.pixelType = "UInt16";
    zmctest::WriteText(path.string(),
                       zmctest::FileWithHeader(header.Text()) + std::string("\1\2\3\4", 4));
    const auto dataset = Open();
    ASSERT_TRUE(dataset);
    const int list[] = {1, 2147483646, 0};
    const zelm::Array<int> bands(const_cast<int*>(list), zelm::ArrayShape(3));
    std::uint16_t pixel[3] = {9, 9, 9};
    bool read = false;
    EXPECT_LT(PeakOf([&] { read = dataset->ReadTile(0, 0, 1, 1, bands, 0, pixel); }), kLittle);
    EXPECT_TRUE(read);
    EXPECT_EQ(pixel[0], 0x403);
    EXPECT_EQ(pixel[1], 0);
    EXPECT_EQ(pixel[2], 0x201);
}

// One column of one band: the rows of tiles around it would have to be held.
TEST_F(WidePixelTest, MergeThatWouldHoldFourGigabytesIsRefused) {
    zmctest::HeaderText header;
    header.width = 300;
    header.height = 40000;
    header.bands = 512;
    zmctest::WriteText(path.string(), zmctest::FileWithHeader(header.Text()));
    const auto size = FileSize();
    const auto dataset = Open();
    ASSERT_TRUE(dataset);
    const Bytes samples(33000, 5);
    bool written = true;
    EXPECT_LT(
        PeakOf([&] { written = WriteBytes(*dataset, 1, 1, 1, 33000, BandList({2}), 0, samples); }),
        kLittle);
    EXPECT_FALSE(written);
    EXPECT_EQ(FileSize(), size);
}

TEST_F(WidePixelTest, ReadsAsTheModelDoes) {
    // A row that is too long, a pixel that is, and a last one that the file holds in part.
    for (const auto& [bands, tile] : {std::pair{20000u, 4u}, {70000u, 4u}, {70000u, 1u}}) {
        PyramidModel model(Wide(bands, tile));
        model.StoreAllImages();
        model.file.resize(model.file.size() - 50001);
        model.Save(path);
        const auto dataset = Open();
        ASSERT_TRUE(dataset);
        for (const Rect& r : kRects)
            for (const std::vector<int>& list : Lists(bands)) {
                const Bytes expected = model.ReadTile(r.x, r.y, r.width, r.height, list, 0);
                EXPECT_EQ(ReadRect(*dataset, r.x, r.y, r.width, r.height, BandList(list), 0),
                          expected);
            }
        std::vector<std::uint16_t> all(std::size_t{2} * 3 * bands, 9);
        const zelm::Array<int> none;
        EXPECT_LT(PeakOf([&] { dataset->ReadTile(1, 4, 2, 3, none, 0, all.data()); }),
                  std::int64_t{70000} * 2 * 4 * 4 * 4 + kLittle);
        const Bytes expected = model.ReadTile(1, 4, 2, 3, {}, 0);
        EXPECT_EQ(std::memcmp(all.data(), expected.data(), expected.size()), 0);
    }
}

TEST_F(WidePixelTest, WritesAsTheModelDoes) {
    for (const auto& [bands, tile] : {std::pair{20000u, 4u}, {70000u, 4u}}) {
        for (const Rect& r : kRects)
            for (const std::vector<int>& list : Lists(bands)) {
                if (r.width == 9) continue;
                SCOPED_TRACE(std::to_string(bands) + ": " + std::to_string(r.x) + ", " +
                             std::to_string(r.width) + ", " + std::to_string(list.size()));
                PyramidModel model(Wide(bands, tile));
                model.StoreAllImages();
                model.file.resize(model.file.size() / 2);
                model.Save(path);
                const auto dataset = Open();
                ASSERT_TRUE(dataset);
                Bytes buffer(std::size_t{r.width} * r.height * list.size() * 2);
                std::mt19937 random(r.width);
                for (unsigned char& byte : buffer) byte = static_cast<unsigned char>(random());
                EXPECT_TRUE(
                    WriteBytes(*dataset, r.x, r.y, r.width, r.height, BandList(list), 0, buffer));
                model.WriteTile(r.x, r.y, r.width, r.height, list, 0, buffer);
                EXPECT_TRUE(zmctest::ReadText(path.string()) ==
                            std::string(model.file.begin(), model.file.end()));
            }
    }
}

TEST_F(WidePixelTest, WritingSomeBandsOfAWidePixelTakesLittle) {
    // So many that there is no room for two by two tiles.
    PyramidModel model(Wide(3000000, 16));
    model.Save(path);
    const auto dataset = Open();
    ASSERT_TRUE(dataset);
    const int list[] = {5};
    const zelm::Array<int> band(const_cast<int*>(list), zelm::ArrayShape(1));
    const std::uint16_t pixels[] = {1, 2, 3, 4, 5, 6, 7};
    // Merged into its tile, and on the path of a last row.
    EXPECT_LT(PeakOf([&] { dataset->WriteTileInterleaved(1, 1, 2, 1, band, 0, pixels); }), kLittle);
    EXPECT_LT(PeakOf([&] { dataset->WriteTileInterleaved(2, 0, 1, 7, band, 0, pixels); }), kLittle);
}

// A tile of a megabyte goes out through a work space of its usual size.
TEST_F(WidePixelTest, WritingALargeTileByPlanesTakesLittle) {
    PyramidDescription d;
    d.samples = d.lines = 2048;
    d.tile = 1024;
    d.bands = 3;
    d.ordering = 2;
    const auto dataset = Create(d);
    const BandList list({2, 0, 1});
    Bytes pixels(std::size_t{1024} * 1024 * 3);
    std::mt19937 random(1);
    for (unsigned char& byte : pixels) byte = static_cast<unsigned char>(random());
    bool wrote = false;
    EXPECT_LT(PeakOf([&] {
                  wrote =
                      dataset->WriteTileMorton(1024, 0, 1024, 1024, list.View(), 0, pixels.data());
              }),
              std::int64_t{512} << 10);
    EXPECT_TRUE(wrote);
    EXPECT_TRUE(ReadRect(*dataset, 1024, 0, 1024, 1024, list, 0) == pixels);
}

}  // namespace
}  // namespace zmctest
