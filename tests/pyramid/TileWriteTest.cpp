#include <gtest/gtest.h>

#include <random>

#include "files/OpenSource.h"
#include "tests/support/PyramidFileTest.h"

namespace zmctest {
namespace {

class TileWriteTest : public PyramidFileTest {
protected:
    // The module's file and the model's, with the same content.
    void Make(std::uint32_t ordering, bool filled, std::uint32_t samples = 1000,
              std::uint32_t lines = 777, std::uint32_t tile = 256) {
        PyramidDescription d;
        d.samples = samples;
        d.lines = lines;
        d.bands = 3;
        d.levelMax = 2;
        d.tile = tile;
        d.type = 12;
        d.ordering = ordering;
        model = std::make_unique<PyramidModel>(d);
        if (filled) model->StoreAllImages();
        model->Save(path);
        dataset = Open();
        ASSERT_TRUE(dataset);
    }

    Bytes Pixels(std::uint32_t width, std::uint32_t height, std::size_t bands) {
        Bytes pixels(std::size_t{width} * height * bands * 2);
        for (unsigned char& byte : pixels) byte = static_cast<unsigned char>(random());
        return pixels;
    }

    // Writes through both; the files have to stay the same, byte for byte.
    void WriteBoth(std::uint32_t x, std::uint32_t y, std::uint32_t width, std::uint32_t height,
                   const std::vector<int>& list, std::uint32_t level) {
        const Bytes pixels = Pixels(width, height, list.empty() ? 3 : list.size());
        EXPECT_TRUE(WriteBytes(*dataset, x, y, width, height, BandList(list),
                               static_cast<int>(level), pixels));
        model->WriteTile(x, y, width, height, list, level, pixels);
    }

    Bytes FileBytes() const { return PyramidModel(path).file; }

    std::mt19937 random{4711};
    std::unique_ptr<PyramidModel> model;
    std::unique_ptr<zelm::PyramidDataset> dataset;
    const std::vector<int> all{0, 1, 2};
};

TEST_F(TileWriteTest, WholeTilesGoDirect) {
    for (std::uint32_t ordering = 0; ordering < 3; ++ordering) {
        Make(ordering, true);
        WriteBoth(256, 512, 256, 256, all, 0);
        EXPECT_EQ(FileBytes(), model->file);
        EXPECT_EQ(ReadRect(*dataset, 256, 512, 256, 256, BandList(all), 0),
                  model->ReadTile(256, 512, 256, 256, all, 0));
    }
}

TEST_F(TileWriteTest, ReadOnlyFileDropsTheWrite) {
    for (const std::uint32_t ordering : {0u, 2u}) {
        Make(ordering, true);
        dataset->File = zelm::files::OpenSource(dataset->FileName, zelm::files::OpenMode::Read);
        dataset->Writable = false;
        EXPECT_TRUE(WriteBytes(*dataset, 0, 0, 256, 256, BandList(all), 0, Pixels(256, 256, 3)));
        EXPECT_TRUE(WriteBytes(*dataset, 5, 5, 20, 20, BandList(all), 0, Pixels(20, 20, 3)));
        EXPECT_EQ(FileBytes(), model->file);
    }
}

TEST_F(TileWriteTest, PartOfATileMergesOrIsDropped) {
    Make(0, true);
    WriteBoth(0, 0, 200, 200, all, 0);
    EXPECT_EQ(FileBytes(), model->file);
    Make(2, true);
    const Bytes before = model->file;
    EXPECT_TRUE(WriteBytes(*dataset, 0, 0, 200, 200, BandList(all), 0, Pixels(200, 200, 3)));
    EXPECT_EQ(FileBytes(), before);
}

TEST_F(TileWriteTest, ExactEdgeTilesGoDirect) {
    for (std::uint32_t ordering = 0; ordering < 3; ++ordering) {
        Make(ordering, false);
        WriteBoth(768, 0, 232, 256, all, 0);
        WriteBoth(0, 768, 256, 9, all, 0);
        WriteBoth(768, 768, 232, 9, all, 0);
        EXPECT_EQ(FileBytes(), model->file);
        EXPECT_EQ(ReadRect(*dataset, 768, 0, 232, 256, BandList(all), 0),
                  model->ReadTile(768, 0, 232, 256, all, 0));
    }
}

TEST_F(TileWriteTest, LastColumnsWidthAloneLandsAtTheTilesStart) {
    for (std::uint32_t ordering = 0; ordering < 3; ++ordering) {
        Make(ordering, true);
        const Bytes pixels = Pixels(232, 10, 3);
        EXPECT_TRUE(WriteBytes(*dataset, 768, 100, 232, 10, BandList(all), 0, pixels));
        EXPECT_EQ(ReadRect(*dataset, 768, 0, 232, 10, BandList(all), 0), pixels);
        EXPECT_EQ(ReadRect(*dataset, 768, 100, 232, 10, BandList(all), 0),
                  model->ReadTile(768, 100, 232, 10, all, 0));
    }
}

TEST_F(TileWriteTest, LastRowsHeightAloneIsWrittenWithoutTheTilesStride) {
    for (std::uint32_t ordering = 0; ordering < 2; ++ordering) {
        Make(ordering, true);
        const Bytes pixels = Pixels(100, 9, 3);
        EXPECT_TRUE(WriteBytes(*dataset, 0, 768, 100, 9, BandList(all), 0, pixels));
        model->Write(model->TileStart(0, 0, 3), pixels.data(), pixels.size());
        EXPECT_EQ(FileBytes(), model->file);
    }
    Make(2, true);
    WriteBoth(0, 768, 100, 9, all, 0);
    EXPECT_EQ(FileBytes(), model->file);
}

TEST_F(TileWriteTest, SomeBandsOfAWholeTileNeverReachIt) {
    Make(0, true);
    const Bytes old = model->ReadTile(0, 0, 256, 256, all, 0);
    WriteBoth(0, 0, 256, 256, {1}, 0);
    EXPECT_EQ(ReadRect(*dataset, 0, 0, 256, 256, BandList(all), 0), old);
    EXPECT_EQ(FileBytes(), model->file) << "the merged tile lies behind";
    // It is the next tile that has changed.
    EXPECT_EQ(ReadRect(*dataset, 256, 0, 256, 256, BandList({0, 2}), 0),
              PickBands(old, 3, 2, {0, 2}));
}

TEST_F(TileWriteTest, SomeBandsOfAMortonTileAreWrittenAlone) {
    Make(2, true);
    const Bytes old = model->ReadTile(0, 0, 256, 256, {0, 2}, 0);
    WriteBoth(0, 0, 256, 256, {1}, 0);
    EXPECT_EQ(FileBytes(), model->file);
    EXPECT_EQ(ReadRect(*dataset, 0, 0, 256, 256, BandList({0, 2}), 0), old);
}

// Where 2^L does not divide the tile size the curve leaves less room than a tile takes, and a band
// reaches into the next: bands go in list order, each whole.
TEST_F(TileWriteTest, MortonBandsThatOverlapGoInListOrderEachWhole) {
    for (const std::uint32_t type : {1u, 12u, 4u, 5u})
        for (const std::vector<int>& list :
             {std::vector<int>{0, 1}, {1, 0}, {0, 1, 2}, {2, 1, 0}, {1, 0, 1}, {2}, {0, 2, 0, 1}}) {
            PyramidDescription d;
            d.samples = d.lines = 2400;
            d.bands = 3;
            d.tile = 300;
            d.levelMin = d.levelMax = 3;
            d.type = type;
            d.ordering = 2;
            model = std::make_unique<PyramidModel>(d);
            model->Save(path);
            dataset = Open();
            ASSERT_TRUE(dataset);
            Bytes pixels(std::size_t{300} * 300 * list.size() * model->SampleBytes());
            for (unsigned char& byte : pixels) byte = static_cast<unsigned char>(random());
            EXPECT_TRUE(WriteBytes(*dataset, 0, 0, 300, 300, BandList(list), 3, pixels));
            model->WriteTile(0, 0, 300, 300, list, 3, pixels);
            EXPECT_TRUE(FileBytes() == model->file) << type << ' ' << list.size();
        }
}

// Tile sizes that no power of two divides, so that tiles of levels and bands overlap.
TEST_F(TileWriteTest, RandomMortonWritesOfOverlappingTilesLeaveTheBytesOfTheModel) {
    for (int round = 0; round < 150; ++round) {
        const auto below = [&](std::uint32_t n) {
            return static_cast<std::uint32_t>(random() % n);
        };
        PyramidDescription d;
        d.tile = 9 + 2 * below(12);
        d.samples = 1 + below(200);
        d.lines = 1 + below(200);
        d.bands = 1 + below(20);
        d.levelMin = below(4);
        d.levelMax = d.levelMin + below(2);
        d.type = below(2) ? 1 : 12;
        d.ordering = 2;
        model = std::make_unique<PyramidModel>(d);
        model->Save(path);
        dataset = Open();
        ASSERT_TRUE(dataset);
        for (int write = 0; write < 12; ++write) {
            const std::uint32_t level = d.levelMin + below(d.levelMax - d.levelMin + 1);
            // Tiles that shrink to nothing have no place.
            if (d.tile >> level == 0 || d.samples >> level == 0 || d.lines >> level == 0) continue;
            const std::uint32_t tx = below(model->Across(level)), ty = below(model->Down(level));
            const std::uint32_t width = model->TileWidth(level, tx);
            const std::uint32_t height = model->TileHeight(level, ty);
            std::vector<int> list(1 + below(d.bands));
            for (int& band : list) band = static_cast<int>(below(d.bands));
            Bytes pixels(std::size_t{width} * height * list.size() * model->SampleBytes());
            for (unsigned char& byte : pixels) byte = static_cast<unsigned char>(random());
            EXPECT_TRUE(WriteBytes(*dataset, tx * d.tile, ty * d.tile, width, height,
                                   BandList(list), static_cast<int>(level), pixels));
            model->WriteTile(tx * d.tile, ty * d.tile, width, height, list, level, pixels);
        }
        ASSERT_TRUE(FileBytes() == model->file) << round;
    }
}

TEST_F(TileWriteTest, AlignedPairOfMortonTilesIsDropped) {
    Make(2, true);
    const Bytes before = model->file;
    EXPECT_TRUE(WriteBytes(*dataset, 0, 0, 512, 256, BandList(all), 0, Pixels(512, 256, 3)));
    EXPECT_EQ(FileBytes(), before);
}

TEST_F(TileWriteTest, SomeBandsMergeIntoAPartOfTheTiles) {
    Make(1, true);
    WriteBoth(200, 200, 100, 100, {2, 0}, 0);
    EXPECT_EQ(FileBytes(), model->file);
}

TEST_F(TileWriteTest, FullWidthStripIsRearranged) {
    Make(0, true);
    const Bytes pixels = Pixels(1000, 256, 3);
    EXPECT_TRUE(WriteBytes(*dataset, 0, 256, 1000, 256, BandList(all), 0, pixels));
    model->Write(model->TileStart(0, 0, 1), pixels.data(), pixels.size());
    EXPECT_EQ(FileBytes(), model->file);
    EXPECT_NE(ReadRect(*dataset, 0, 256, 1000, 256, BandList(all), 0), pixels);
    // Off the grid it goes to the start of its first tile all the same.
    const Bytes more = Pixels(1000, 256, 3);
    EXPECT_TRUE(WriteBytes(*dataset, 0, 100, 1000, 256, BandList(all), 0, more));
    model->Write(model->TileStart(0, 0, 0), more.data(), more.size());
    EXPECT_EQ(FileBytes(), model->file);
}

TEST_F(TileWriteTest, FullWidthStripOfOneTileColumnIsTileOrder) {
    Make(0, false, 200, 777);
    const Bytes pixels = Pixels(200, 256, 3);
    EXPECT_TRUE(WriteBytes(*dataset, 0, 256, 200, 256, BandList(all), 0, pixels));
    EXPECT_EQ(ReadRect(*dataset, 0, 256, 200, 256, BandList(all), 0), pixels);
}

TEST_F(TileWriteTest, MergingIntoAnUnwrittenTileSurroundsItWithZeros) {
    Make(0, false);
    // Other pixels go through the work buffer first: none of them may leak.
    WriteBoth(10, 10, 200, 180, all, 2);
    WriteBoth(500, 500, 100, 100, all, 0);
    EXPECT_EQ(FileBytes(), model->file);
    EXPECT_EQ(FileSize(), model->TileStart(0, 2, 2) + 256 * 256 * 6) << "whole tiles come to exist";
}

TEST_F(TileWriteTest, MergingIntoTheLastTileCompletesTheFile) {
    Make(0, false);
    WriteBoth(990, 770, 3, 3, all, 0);
    EXPECT_EQ(FileSize(), dataset->TileDataEnd);
    EXPECT_FALSE(dataset->HasPyramid);
    EXPECT_TRUE(dataset->RefreshPyramidState());
    EXPECT_TRUE(dataset->HasPyramid);
}

TEST_F(TileWriteTest, LastPlacementOfTheLastBandCompletesAMortonFile) {
    Make(2, false);
    const BandList last({2});
    EXPECT_TRUE(WriteBytes(*dataset, 0, 0, 250, 194, last, 2, Pixels(250, 194, 1)));
    EXPECT_TRUE(dataset->RefreshPyramidState());
    EXPECT_TRUE(dataset->HasPyramid);
}

TEST_F(TileWriteTest, WrongFamilyIsRefused) {
    Make(0, true);
    std::vector<unsigned short> pixels(256 * 256 * 3);
    EXPECT_FALSE(dataset->WriteTileMorton<unsigned short>(0, 0, 256, 256, BandList(all).View(), 0,
                                                          pixels.data()));
    Make(2, true);
    EXPECT_FALSE(dataset->WriteTileInterleaved<unsigned short>(0, 0, 256, 256, BandList(all).View(),
                                                               0, pixels.data()));
    EXPECT_EQ(FileBytes(), model->file);
}

// Any mixture of rectangles, the oddly placed ones included, leaves the bytes that the rules tell.
TEST_F(TileWriteTest, RandomWritesLeaveTheBytesOfTheModel) {
    for (std::uint32_t ordering = 0; ordering < 3; ++ordering)
        for (const bool filled : {true, false}) {
            Make(ordering, filled, 150, 117, 32);
            const auto below = [&](std::uint32_t n) {
                return static_cast<std::uint32_t>(random() % n);
            };
            for (int round = 0; round < 400; ++round) {
                const std::uint32_t level = below(3);
                const std::uint32_t width = 150u >> level;
                const std::uint32_t height = 117u >> level;
                std::uint32_t x = below(width);
                std::uint32_t y = below(height);
                std::uint32_t w = 1 + below(width - x);
                std::uint32_t h = 1 + below(height - y);
                if (round % 2) {  // a tile, or one extent of a tile
                    x = x / 32 * 32;
                    w = std::min(32u, width - x);
                }
                if (round % 4 > 1) {
                    y = y / 32 * 32;
                    h = std::min(32u, height - y);
                }
                if (round % 10 == 0) {
                    x = 0;
                    w = width;
                }
                std::vector<int> list = all;
                if (round % 3 == 1) list = {2, 0};
                if (round % 3 == 2) list = {1, 2, 0};
                WriteBoth(x, y, w, h, list, level);
                if (round % 40 == 0) {
                    ASSERT_EQ(FileBytes(), model->file) << ordering << " " << round;
                }
            }
            ASSERT_EQ(FileBytes(), model->file);
            EXPECT_EQ(ReadRect(*dataset, 0, 0, 150, 117, BandList(all), 0),
                      model->ReadTile(0, 0, 150, 117, all, 0));
        }
}

TEST_F(TileWriteTest, BothEndsOfAFileBeyondFourGigabytes) {
    for (std::uint32_t ordering = 0; ordering < 3; ++ordering) {
        PyramidDescription d;
        d.samples = d.lines = 40000;
        d.bands = 3;
        d.type = 1;
        d.levelMax = 8;
        d.ordering = ordering;
        const auto made = Create(d);
        ASSERT_TRUE(made->File);
        EXPECT_GT(made->TileDataEnd, std::uint64_t{5} << 30);
        const BandList list(all);
        Bytes last(64 * 64 * 3);
        for (std::size_t i = 0; i < last.size(); ++i) last[i] = static_cast<unsigned char>(i * 7);
        const Bytes first(256 * 256 * 3, 0x33);
        const Bytes coarse(156 * 156 * 3, 0x44);
        EXPECT_TRUE(WriteBytes(*made, 39936, 39936, 64, 64, list, 0, last));
        EXPECT_TRUE(WriteBytes(*made, 0, 0, 256, 256, list, 0, first));
        EXPECT_TRUE(WriteBytes(*made, 0, 0, 156, 156, list, 8, coarse));
        EXPECT_TRUE(made->RefreshPyramidState());
        EXPECT_TRUE(made->HasPyramid);
        EXPECT_EQ(FileSize(), made->TileDataEnd);
        const auto opened = Open();
        ASSERT_TRUE(opened);
        EXPECT_TRUE(opened->HasPyramid);
        EXPECT_EQ(ReadRect(*opened, 39936, 39936, 64, 64, list, 0), last);
        EXPECT_EQ(ReadRect(*opened, 0, 0, 256, 256, list, 0), first);
        EXPECT_EQ(ReadRect(*opened, 0, 0, 156, 156, list, 8), coarse);
        EXPECT_EQ(ReadRect(*opened, 20000, 20000, 50, 50, list, 0), Bytes(50 * 50 * 3, 0));
    }
}

}  // namespace
}  // namespace zmctest
