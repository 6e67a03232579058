// What the module does when the disk fails under it. The files are good; the calls fail.
#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>

#include "core/PixelVocabulary.h"
#include "pyramid/PyramidDataConnection.h"
#include "pyramid/PyramidRasterReader.h"
#include "tests/support/FileFaults.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/ScratchDirectory.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {

using namespace zelm;
namespace {

class DiskFailureTest : public ::testing::Test {
protected:
    static constexpr std::uint32_t kSamples = 300, kLines = 280;

    FileFaults Fail(unsigned calls, std::size_t n, int error = EIO) {
        return FileFaults({folder.String(), calls, n, false, FileFaultAction::Error, error});
    }

    // A file of two bands whose samples are all 7.
    void Make(std::uint32_t tileLines, std::uint32_t bands = 2) {
        PyramidDataset dataset(String(name.c_str()),
                               PyramidProps(kSamples, kLines, bands, 1, tileLines));
        dataset.CreateFile(0, 0);
        Array<int> all;
        for (std::uint32_t band = 0; band < bands; ++band) all.Append(static_cast<int>(band));
        std::vector<unsigned char> pixels(std::size_t{256} * 256 * bands, 7);
        for (const std::uint32_t y : {0u, 256u})
            for (const std::uint32_t x : {0u, 256u}) {
                const std::uint32_t width = std::min(256u, kSamples - x);
                const std::uint32_t height = std::min(256u, kLines - y);
                if (bands > 8)
                    dataset.WriteTileMorton(x, y, width, height, all, 0, pixels.data());
                else
                    dataset.WriteTileInterleaved(x, y, width, height, all, 0, pixels.data());
            }
    }

    zmctest::ScratchDirectory folder;
    const std::string name = folder / "scene.pyr";
};

TEST_F(DiskFailureTest, PixelsAroundAPartialTileAreNotLost) {
    Make(256);
    const std::string before = zmctest::ReadText(name);
    PyramidDataset dataset{String(name.c_str())};
    ASSERT_FALSE(dataset.ReadHeader());
    Array<int> bands;
    bands.Append(0);
    bands.Append(1);
    std::vector<unsigned char> pixels(200, 9);
    {
        const FileFaults faults = Fail(zmctest::kReadCall, 1);
        EXPECT_TRUE(dataset.WriteTileInterleaved(5, 5, 10, 10, bands, 0, pixels.data()));
        EXPECT_EQ(faults.Failed(), 1u);
    }
    EXPECT_EQ(zmctest::ReadText(name), before);
    EXPECT_TRUE(dataset.WriteTileInterleaved(5, 5, 10, 10, bands, 0, pixels.data()));
    EXPECT_NE(zmctest::ReadText(name), before);
}

TEST_F(DiskFailureTest, MergeThatCannotReadDoesNotExtendTheFileEither) {
    Make(256);
    // Short of its last tile, into which the merge reaches.
    std::filesystem::resize_file(name, std::filesystem::file_size(name) - 100);
    const std::string before = zmctest::ReadText(name);
    PyramidDataset dataset{String(name.c_str())};
    ASSERT_FALSE(dataset.ReadHeader());
    Array<int> bands;
    bands.Append(0);
    bands.Append(1);
    const std::vector<unsigned char> pixels(200, 9);
    {
        const FileFaults faults = Fail(zmctest::kReadCall, 1);
        EXPECT_TRUE(dataset.WriteTileInterleaved(257, 257, 10, 10, bands, 0, pixels.data()));
        EXPECT_EQ(faults.Failed(), 1u);
    }
    EXPECT_TRUE(zmctest::ReadText(name) == before);
}

TEST_F(DiskFailureTest, BandsBesideTheListedOnesAreNotInvented) {
    Make(256);
    const std::string before = zmctest::ReadText(name);
    PyramidDataset dataset{String(name.c_str())};
    ASSERT_FALSE(dataset.ReadHeader());
    Array<int> bands;
    bands.Append(1);
    std::vector<unsigned char> pixels(65536, 9);
    const FileFaults faults = Fail(zmctest::kReadCall, 1);
    EXPECT_TRUE(dataset.WriteTileInterleaved(0, 0, 256, 256, bands, 0, pixels.data()));
    EXPECT_EQ(faults.Failed(), 1u);
    EXPECT_EQ(zmctest::ReadText(name), before);
}

// Whichever of its tiles, and whichever part of a tile, is the one that cannot be read.
TEST_F(DiskFailureTest, MergeThatCannotReadTheOldSamplesWritesNothing) {
    for (const std::uint32_t count : {2u, 3000u, 140000u}) {
        const std::uint32_t width = count == 2 ? 290 : 3;
        const std::uint32_t height = count == 2 ? 270 : 7;
        Make(256, 2);
        if (count > 2) {
            PyramidDataset made(String(name.c_str()), PyramidProps(9, 9, count, 1, 256));
            made.TileSize = 4;
            made.TileOrdering = TileOrder::Blocked;
            made.CreateFile(0, 0);
            made.File->WriteAt(made.TileDataEnd - 1, "x", 1);
        }
        PyramidDataset dataset{String(name.c_str())};
        ASSERT_FALSE(dataset.ReadHeader());
        const std::string before = zmctest::ReadText(name);
        Array<int> some;
        some.Append(static_cast<int>(count) - 1);
        Array<int> all;
        std::vector<unsigned char> pixels(std::size_t{width} * height * count, 9);
        // Over several tiles with all bands and with one, and one band in a place that goes direct.
        struct Case {
            std::uint32_t x, y, width, height;
            const Array<int>& bands;
        };
        for (const Case& c :
             {Case{1, 1, width, height, all}, Case{1, 1, width, height, some},
              Case{dataset.Samples - 1, 0, 1, 2, some}, Case{0, 0, 256, 256, some}}) {
            if (c.x + c.width > dataset.Samples) continue;
            std::size_t n = 1;
            for (bool met = true; met; ++n) {
                FileFaults faults = Fail(zmctest::kReadCall, n);
                EXPECT_TRUE(dataset.WriteTileInterleaved(c.x, c.y, c.width, c.height, c.bands, 0,
                                                         pixels.data()));
                faults.Disarm();
                met = faults.Failed() != 0;
                ASSERT_TRUE(!met || zmctest::ReadText(name) == before) << count << ' ' << n;
            }
            zmctest::WriteText(name, before);
        }
    }
}

// What could not be read is left as it was where a whole tile comes as it lies, and zeros
// elsewhere; in the ordering Morton no tile of several bands does.
TEST_F(DiskFailureTest, ReadsThatFailAnswerTrueAndInventNothing) {
    for (const std::uint32_t count : {1u, 2u, 9u}) {
        Make(256, count);
        PyramidDataset dataset{String(name.c_str())};
        ASSERT_FALSE(dataset.ReadHeader());
        Array<int> all, last;
        for (std::uint32_t band = 0; band < count; ++band) all.Append(static_cast<int>(band));
        last.Append(static_cast<int>(count) - 1);
        for (const Array<int>* bands : {&all, &last})
            for (const std::uint32_t side : {256u, 100u}) {
                SCOPED_TRACE(std::to_string(count) + " bands, side " + std::to_string(side));
                const std::size_t size = std::size_t{side} * side * bands->shape.elements;
                std::vector<unsigned char> pixels(size, 3);
                const bool inPlace = side == 256 && count < 9 && bands->shape.elements == count;
                FileFaults faults(
                    {folder.String(), zmctest::kReadCall, 1, true, FileFaultAction::Error, EIO});
                EXPECT_TRUE(dataset.ReadTile(0, 0, side, side, *bands, 0, pixels.data()));
                EXPECT_NE(faults.Failed(), 0u);
                faults.Disarm();
                EXPECT_EQ(pixels, std::vector<unsigned char>(size, inPlace ? 3 : 0));
                EXPECT_TRUE(dataset.ReadTile(0, 0, side, side, *bands, 0, pixels.data()));
                EXPECT_EQ(pixels, std::vector<unsigned char>(size, 7));
            }
    }
}

TEST_F(DiskFailureTest, ReaderAnswersTrueWhateverTheDiskDid) {
    for (const std::uint32_t count : {2u, 9u}) {
        Make(256, count);
        PyramidDataConnection connection;
        Array<String> parameters;
        parameters.Append(String(name.c_str()));
        ASSERT_TRUE(connection.Open(parameters, GeoRefPtr(), MetadataPtr()));
        PyramidRasterReader<unsigned char> reader(&connection, GeoRefPtr(), MetadataPtr());
        RasterProps noData;
        noData.SetBands(count);
        noData.SetNoDataValue(0, 0);
        reader.SetNoDataValues(noData);
        Array<int> first;
        first.Append(0);
        for (const std::uint32_t side : {256u, 10u}) {
            std::vector<unsigned char> pixels(std::size_t{side} * side, 3);
            std::vector<unsigned char> mask(pixels.size(), 0);
            const FileFaults faults(
                {folder.String(), zmctest::kAnyCall, 1, true, FileFaultAction::Error, EIO});
            EXPECT_TRUE(reader.ReadTile(0, 0, side, side, first, 0, pixels.data(), mask.data()));
            EXPECT_EQ(mask, std::vector<unsigned char>(mask.size(), 1)) << "made from the zeros";
            mask.assign(mask.size(), 0);
            EXPECT_TRUE(reader.WriteTile(0, 0, side, side, first, 0, pixels.data(), mask.data()));
            EXPECT_NE(faults.Failed(), 0u);
        }
    }
}

TEST_F(DiskFailureTest, FileOfUnknownSizeIsNotTakenForAnEmptyOne) {
    Make(256);
    Array<RasterBandStats<unsigned char>> stats;
    stats.Append({});
    {
        PyramidDataset dataset{String(name.c_str())};
        ASSERT_FALSE(dataset.ReadHeader());
        ASSERT_TRUE(dataset.SetBandStats(stats));
    }
    const std::string before = zmctest::ReadText(name);
    std::size_t opened = 0;
    bool met = true;
    for (std::size_t n = 1; met; ++n) {
        PyramidDataset dataset{String(name.c_str())};
        FileFaults faults = Fail(zmctest::kStatusCall, n);
        const bool open = !dataset.ReadHeader();
        faults.Disarm();
        met = faults.Failed() != 0;
        if (!met || !open) continue;
        ++opened;
        dataset.SetBandStats(stats);
        const std::string after = zmctest::ReadText(name);
        EXPECT_TRUE(after == before ||
                    after.find("<BANDSTATISTICS>") != after.rfind("<BANDSTATISTICS>"))
            << "the old record went, at " << n;
        zmctest::WriteText(name, before);
    }
    EXPECT_GT(opened, 0u);
}

TEST_F(DiskFailureTest, HeaderThatCouldNotBeWrittenIsRefused) {
    bool met = true;
    for (std::size_t n = 1; met; ++n) {
        PyramidDataset made(String(name.c_str()), PyramidProps(kSamples, kLines, 2, 1, 256));
        FileFaults faults = Fail(zmctest::kWriteCall, n);
        made.CreateFile(0, 0);
        faults.Disarm();
        met = faults.Failed() != 0;
        PyramidDataset again{String(name.c_str())};
        EXPECT_EQ(again.ReadHeader(), met) << "true is failure; write " << n;
    }
}

// Rows come and go in runs as long as the work space, whatever part of them is wanted.
TEST_F(DiskFailureTest, RowsOfATileTakeFewCalls) {
    Make(256);
    PyramidDataset dataset{String(name.c_str())};
    ASSERT_FALSE(dataset.ReadHeader());
    for (const std::vector<int>& list : {std::vector<int>{0, 1}, {1}}) {
        Array<int> bands;
        for (const int band : list) bands.Append(band);
        std::vector<unsigned char> pixels(std::size_t{200} * 200 * list.size(), 8);
        const auto calls = [&](unsigned kind, bool write) {
            const FileFaults faults = Fail(kind, 0);
            if (write)
                EXPECT_TRUE(dataset.WriteTileInterleaved(5, 5, 200, 200, bands, 0, pixels.data()));
            else
                EXPECT_TRUE(dataset.ReadTile(5, 5, 200, 200, bands, 0, pixels.data()));
            return faults.Count();
        };
        // 200 rows of 512 bytes are less than 128 KiB.
        EXPECT_EQ(calls(zmctest::kReadCall, false), 1u);
        EXPECT_EQ(calls(zmctest::kReadCall, true), 1u);
        EXPECT_EQ(calls(zmctest::kWriteCall, true), 1u);
    }
}

}  // namespace
}  // namespace zmctest
