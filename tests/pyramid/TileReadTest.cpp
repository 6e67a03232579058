#include <gtest/gtest.h>

#include <random>

#include "tests/support/PyramidFileTest.h"

namespace zmctest {
namespace {

// A filled file of 1000 x 777 pixels with three bands, in each of the orderings.
class TileReadTest : public PyramidFileTest, public testing::WithParamInterface<std::uint32_t> {
protected:
    TileReadTest() {
        PyramidDescription d;
        d.samples = 1000;
        d.lines = 777;
        d.bands = 3;
        d.levelMax = 2;
        d.type = 12;
        d.ordering = GetParam();
        model = std::make_unique<PyramidModel>(d);
        model->StoreAllImages();
        model->Save(path);
        for (std::uint32_t level = 0; level < 3; ++level) images.push_back(model->Image(level));
        dataset = Open();
    }

    bool IsMorton() const { return GetParam() == 2; }
    Bytes Expected(std::uint32_t x, std::uint32_t y, std::uint32_t width, std::uint32_t height,
                   std::uint32_t level = 0) const {
        return Crop(images[level], 1000u >> level, 6, x, y, width, height);
    }

    const BandList all{{0, 1, 2}};
    std::vector<Bytes> images;
    std::unique_ptr<PyramidModel> model;
    std::unique_ptr<zelm::PyramidDataset> dataset;
};
INSTANTIATE_TEST_SUITE_P(Orderings, TileReadTest, testing::Values(0u, 1u, 2u));

TEST_P(TileReadTest, WholeAlignedTile) {
    EXPECT_EQ(ReadRect(*dataset, 256, 512, 256, 256, all, 0), Expected(256, 512, 256, 256));
}

TEST_P(TileReadTest, LastColumnsTileIsNarrower) {
    EXPECT_EQ(ReadRect(*dataset, 768, 0, 232, 256, all, 0), Expected(768, 0, 232, 256));
}

TEST_P(TileReadTest, RectangleOverFourTiles) {
    EXPECT_EQ(ReadRect(*dataset, 200, 200, 100, 100, all, 0), Expected(200, 200, 100, 100));
}

TEST_P(TileReadTest, RowOverTwoTiles) {
    EXPECT_EQ(ReadRect(*dataset, 200, 200, 100, 1, all, 0), Expected(200, 200, 100, 1));
}

TEST_P(TileReadTest, BottomRightTileOfLevelOne) {
    EXPECT_EQ(ReadRect(*dataset, 256, 256, 244, 132, all, 1), Expected(256, 256, 244, 132, 1));
}

TEST_P(TileReadTest, WholeLevels) {
    for (std::uint32_t level = 0; level < 3; ++level) {
        const std::uint32_t width = 1000u >> level;
        const std::uint32_t height = 777u >> level;
        EXPECT_EQ(ReadRect(*dataset, 0, 0, width, height, all, static_cast<int>(level)),
                  model->Image(level));
    }
}

TEST_P(TileReadTest, BandsComeInListOrder) {
    for (const auto& list :
         std::vector<std::vector<int>>{{2, 0}, {1}, {0, 1}, {2, 1, 0}, {0, 2, 2, 1}}) {
        for (const auto& [x, y, w, h] : std::vector<std::array<std::uint32_t, 4>>{
                 {0, 0, 256, 256}, {200, 200, 100, 100}, {768, 768, 232, 9}}) {
            EXPECT_EQ(ReadRect(*dataset, x, y, w, h, BandList(list), 0),
                      PickBands(Expected(x, y, w, h), 3, 2, list));
        }
    }
}

TEST_P(TileReadTest, EmptyListIsAllBandsOrRefused) {
    Bytes buffer(256 * 256 * 6, 1);
    EXPECT_EQ(ReadBytes(*dataset, 0, 0, 256, 256, BandList({}), 0, buffer), !IsMorton());
    EXPECT_EQ(buffer, IsMorton() ? Bytes(buffer.size(), 1) : Expected(0, 0, 256, 256));
}

TEST_P(TileReadTest, WhatTheFileDoesNotHoldIsRefused) {
    struct Case {
        std::uint32_t x, y, width, height;
        std::vector<int> list;
        int level;
    };
    const std::vector<Case> cases{
        {745, 0, 256, 1, {0}, 0},      {0, 777, 1, 1, {0}, 0},        {0, 776, 1, 2, {0}, 0},
        {1000, 0, 1, 1, {0}, 0},       {0xFFFFFFFF, 0, 1, 1, {0}, 0}, {1, 0, 0xFFFFFFFF, 1, {0}, 0},
        {0, 1, 1, 0xFFFFFFFF, {0}, 0}, {500, 0, 1, 1, {0}, 1},        {0, 0, 1, 1, {3}, 0},
        {0, 0, 1, 1, {0, -1}, 0},      {0, 0, 1, 1, {0}, 3},          {0, 0, 1, 1, {0}, -1},
        {0, 0, 1, 1, {0}, 32}};
    const Bytes before = model->file;
    for (const Case& c : cases) {
        EXPECT_FALSE(
            dataset->AcceptsTile(c.x, c.y, c.width, c.height, BandList(c.list).View(), c.level));
        Bytes buffer(64, 0x5A);
        EXPECT_FALSE(
            ReadBytes(*dataset, c.x, c.y, c.width, c.height, BandList(c.list), c.level, buffer));
        EXPECT_EQ(buffer, Bytes(64, 0x5A));
        EXPECT_FALSE(
            WriteBytes(*dataset, c.x, c.y, c.width, c.height, BandList(c.list), c.level, buffer));
    }
    EXPECT_EQ(PyramidModel(path).file, before);
}

TEST_P(TileReadTest, FourGigabytesAreTooManyForOneTransfer) {
    // 1000 x 777 pixels of two bytes: the list makes the transfer as large as one likes.
    const std::vector<int> list((std::size_t{1} << 32) / (1000 * 777 * 2) + 1, 0);
    EXPECT_FALSE(dataset->AcceptsTile(0, 0, 1000, 777, BandList(list).View(), 0));
    EXPECT_TRUE(dataset->AcceptsTile(0, 0, 1000, 776, BandList(list).View(), 0));
}

TEST_P(TileReadTest, NoWidthNoHeightAndNoFileMoveNothing) {
    Bytes buffer(64, 0x5A);
    EXPECT_TRUE(ReadBytes(*dataset, 0, 0, 0, 5, all, 0, buffer));
    EXPECT_TRUE(ReadBytes(*dataset, 0, 0, 5, 0, all, 0, buffer));
    EXPECT_TRUE(ReadBytes(*dataset, 9999, 0, 0, 5, BandList({7}), 99, buffer));
    dataset->File.reset();
    EXPECT_TRUE(ReadBytes(*dataset, 0, 0, 2, 2, all, 0, buffer));
    EXPECT_TRUE(WriteBytes(*dataset, 0, 0, 2, 2, all, 0, buffer));
    EXPECT_EQ(buffer, Bytes(64, 0x5A));
}

TEST_P(TileReadTest, ElementsOfAnotherSizeAndNoBufferAreRefused) {
    std::vector<double> buffer(300, 1.5);
    EXPECT_FALSE(dataset->ReadTile<double>(0, 0, 10, 10, all.View(), 0, buffer.data()));
    EXPECT_EQ(buffer, std::vector<double>(300, 1.5));
    EXPECT_FALSE(dataset->ReadTile<short>(0, 0, 10, 10, all.View(), 0, nullptr));
}

TEST_P(TileReadTest, RandomRectanglesAlsoAsSmallerOnes) {
    std::mt19937 random(GetParam() + 1);
    const auto below = [&](std::uint32_t n) { return static_cast<std::uint32_t>(random() % n); };
    for (int round = 0; round < 150; ++round) {
        const std::uint32_t level = below(3);
        const std::uint32_t levelWidth = 1000u >> level;
        const std::uint32_t levelHeight = 777u >> level;
        const std::uint32_t x = below(levelWidth);
        const std::uint32_t y = below(levelHeight);
        const std::uint32_t w = 1 + below(std::min(levelWidth - x, 400u));
        const std::uint32_t h = 1 + below(std::min(levelHeight - y, 400u));
        std::vector<int> list(1 + below(4));
        for (int& band : list) band = static_cast<int>(below(3));
        if (round % 3 == 0) list = {0, 1, 2};
        const Bytes expected = PickBands(Expected(x, y, w, h, level), 3, 2, list);
        const int l = static_cast<int>(level);
        ASSERT_EQ(ReadRect(*dataset, x, y, w, h, BandList(list), l), expected);
        const std::uint32_t split = below(h);
        Bytes parts = ReadRect(*dataset, x, y, w, split, BandList(list), l);
        const Bytes rest = ReadRect(*dataset, x, y + split, w, h - split, BandList(list), l);
        parts.insert(parts.end(), rest.begin(), rest.end());
        ASSERT_EQ(parts, expected);
    }
}

TEST_P(TileReadTest, ShortFileReadsAsZerosExceptWholeTilesInPlace) {
    std::filesystem::resize_file(path, model->tileDataStart);
    const Bytes zeros(100 * 100 * 6, 0);
    EXPECT_EQ(ReadRect(*dataset, 200, 200, 100, 100, all, 0), zeros);
    EXPECT_EQ(ReadRect(*dataset, 0, 0, 256, 256, BandList({1}), 0), Bytes(256 * 256 * 2, 0));
    EXPECT_EQ(ReadRect(*dataset, 768, 0, 232, 256, all, 0), Bytes(232 * 256 * 6, 0));
    Bytes whole(256 * 256 * 6, 0x5A);
    EXPECT_TRUE(ReadBytes(*dataset, 0, 0, 256, 256, all, 0, whole));
    EXPECT_EQ(whole, Bytes(whole.size(), IsMorton() ? 0 : 0x5A));
}

TEST_P(TileReadTest, FileCutInsideATileGivesWhatIsThere) {
    const std::uint64_t cut = model->TileStart(0, 1, 1) + 1001;
    std::filesystem::resize_file(path, cut);
    model->file.resize(cut);
    EXPECT_EQ(ReadRect(*dataset, 100, 100, 300, 300, all, 0),
              model->ReadTile(100, 100, 300, 300, {0, 1, 2}, 0));
}

// Tiles so large that a piece is gathered in several runs of rows, and more bands than are
// gathered together.
TEST_F(PyramidFileTest, LargeTilesAndManyBands) {
    for (std::uint32_t ordering = 0; ordering < 3; ++ordering) {
        PyramidDescription d;
        d.samples = 300;
        d.lines = 211;
        d.bands = 37;
        d.tile = 200;
        d.type = 4;
        d.ordering = ordering;
        PyramidModel model(d);
        model.StoreAllImages();
        model.Save(path);
        const auto dataset = Open();
        ASSERT_TRUE(dataset);
        EXPECT_EQ(ReadRect(*dataset, 7, 3, 290, 205, BandList(AllBands(37)), 0),
                  Crop(model.Image(0), 300, 37 * 4, 7, 3, 290, 205));
        const std::vector<int> list{36, 0, 17, 16, 15, 20, 1,  2,  3, 4,
                                    5,  6, 7,  8,  9,  10, 11, 12, 13};
        EXPECT_EQ(ReadRect(*dataset, 7, 3, 290, 205, BandList(list), 0),
                  PickBands(Crop(model.Image(0), 300, 37 * 4, 7, 3, 290, 205), 37, 4, list));
    }
}

}  // namespace
}  // namespace zmctest
