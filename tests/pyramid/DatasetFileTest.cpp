#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <fstream>

#include "tests/support/ProcessorTime.h"
#include "tests/support/PyramidFileTest.h"

namespace zmctest {
namespace {

using zelm::PyramidDataset;
using DatasetFileTest = PyramidFileTest;

PyramidDescription Sample1000By777() {
    PyramidDescription d;
    d.samples = 1000;
    d.lines = 777;
    d.bands = 3;
    d.levelMax = 2;
    return d;
}

TEST_F(DatasetFileTest, DescribedDatasetOpensNothing) {
    const auto dataset = Describe(Sample1000By777());
    EXPECT_FALSE(dataset->File);
    EXPECT_FALSE(dataset->Writable);
    EXPECT_FALSE(dataset->HasPyramid);
    EXPECT_EQ(dataset->VersionMajor, 0u);
    EXPECT_EQ(dataset->TileSize, 256u);
    EXPECT_FALSE(std::filesystem::exists(path));
    EXPECT_TRUE(dataset->FileName == path.c_str());
    EXPECT_TRUE(dataset->SourceName.IsEmpty());
}

TEST_F(DatasetFileTest, NamedDatasetHasNoLayout) {
    const zelm::PyramidDataset dataset{zelm::String(path.c_str())};
    EXPECT_FALSE(dataset.File);
    EXPECT_FALSE(dataset.Writable);
    EXPECT_FALSE(dataset.HasPyramid);
    for (const std::uint32_t field :
         {dataset.VersionMajor, dataset.VersionMinor, dataset.BandCount, dataset.Samples,
          dataset.Lines, dataset.TileSize, dataset.LevelCount, dataset.LevelMin, dataset.LevelMax,
          dataset.PixelType, dataset.TileOrdering})
        EXPECT_EQ(field, 0u);
    EXPECT_EQ(dataset.Interleave, -1);
    EXPECT_EQ(dataset.BytesPerSample, 1u);
    EXPECT_EQ(dataset.TileDataStart + dataset.TileDataEnd + dataset.MetaDocumentOffset, 0u);
}

TEST_F(DatasetFileTest, OrderingFollowsBandsThenTileLines) {
    zelm::RasterProps props;
    props.bands = 8;
    EXPECT_EQ(PyramidDataset("x", props).TileOrdering, 0u);
    props.tileLines = 1;
    EXPECT_EQ(PyramidDataset("x", props).TileOrdering, 0u);
    props.tileLines = 2;
    EXPECT_EQ(PyramidDataset("x", props).TileOrdering, 1u);
    props.bands = 9;
    EXPECT_EQ(PyramidDataset("x", props).TileOrdering, 2u);
    props.tileLines = 0;
    EXPECT_EQ(PyramidDataset("x", props).TileOrdering, 2u);
}

TEST_F(DatasetFileTest, LevelTableOf1000By777) {
    const auto dataset = Create(Sample1000By777());
    const std::uint64_t start = dataset->TileDataStart;
    EXPECT_EQ(dataset->LevelOffsets[2], start);
    EXPECT_EQ(dataset->LevelOffsets[1], start + 145500);
    EXPECT_EQ(dataset->LevelOffsets[0], start + 727500);
    EXPECT_EQ(dataset->TileDataEnd, start + 3058500);
    EXPECT_EQ(dataset->MetaDocumentOffset, dataset->TileDataEnd);
    EXPECT_EQ(dataset->GetTileOffset(3, 3, 0), 2324736u);
    EXPECT_EQ(dataset->GetTileOffset(1, 2, 0), 1732608u);
    EXPECT_EQ(dataset->LevelCount, 3u);
}

TEST_F(DatasetFileTest, NewFileEndsWithItsHeaderAndIsIncomplete) {
    const auto dataset = Create(Sample1000By777());
    EXPECT_FALSE(dataset->HasPyramid);
    EXPECT_TRUE(dataset->Writable);
    EXPECT_EQ(FileSize(), dataset->TileDataStart);
    EXPECT_FALSE(dataset->HeaderDocument);
    const PyramidModel model(path);
    EXPECT_EQ(model.file[0], 'K');
    EXPECT_EQ(model.tileDataStart, dataset->TileDataStart);
    EXPECT_EQ(model.tileDataEnd, dataset->TileDataEnd);
    EXPECT_EQ(model.d.versionMajor, 1u);
    EXPECT_EQ(model.d.versionMinor, 1u);
    EXPECT_EQ(model.d.tile, 256u);
    EXPECT_EQ(model.d.levelMax, 2u);
    unsigned char offset[8];
    dataset->File->ReadAt(12, offset, 8);
    std::uint64_t stored = 0;
    for (int i = 7; i >= 0; --i) stored = stored << 8 | offset[i];
    EXPECT_EQ(stored, dataset->TileDataEnd);
}

TEST_F(DatasetFileTest, LastByteOfTheTileDataCompletesAtTheNextRefresh) {
    const auto dataset = Create(Sample1000By777());
    dataset->File->WriteAt(dataset->TileDataEnd - 1, "x", 1);
    EXPECT_FALSE(dataset->HasPyramid);
    EXPECT_TRUE(dataset->RefreshPyramidState());
    EXPECT_TRUE(dataset->HasPyramid);
}

TEST_F(DatasetFileTest, OneByteShortIsIncomplete) {
    const auto dataset = Create(Sample1000By777());
    dataset->File->WriteAt(dataset->TileDataEnd - 2, "x", 1);
    EXPECT_TRUE(dataset->RefreshPyramidState());
    EXPECT_FALSE(dataset->HasPyramid);
}

TEST_F(DatasetFileTest, Version10NeverCountsAsComplete) {
    for (const auto& [major, minor, complete] :
         std::vector<std::tuple<std::uint32_t, std::uint32_t, bool>>{{0, 9, false},
                                                                     {1, 0, false},
                                                                     {1, 1, true},
                                                                     {1, 7, true},
                                                                     {2, 0, true},
                                                                     {99, 0, true}}) {
        PyramidDescription d;
        d.versionMajor = major;
        d.versionMinor = minor;
        PyramidModel model(d);
        model.StoreAllImages();
        model.Save(path);
        const auto dataset = Open();
        ASSERT_TRUE(dataset);
        EXPECT_EQ(dataset->HasPyramid, complete) << major << "." << minor;
    }
}

TEST_F(DatasetFileTest, OpeningGivesTheHeaderBack) {
    for (std::uint32_t ordering = 0; ordering < 3; ++ordering) {
        auto d = Sample1000By777();
        d.ordering = ordering;
        d.type = 2;
        const auto made = Create(d);
        const auto dataset = Open();
        ASSERT_TRUE(dataset);
        EXPECT_EQ(dataset->VersionMajor, 1u);
        EXPECT_EQ(dataset->VersionMinor, 1u);
        EXPECT_EQ(dataset->BandCount, 3u);
        EXPECT_EQ(dataset->Samples, 1000u);
        EXPECT_EQ(dataset->Lines, 777u);
        EXPECT_EQ(dataset->LevelMin, 0u);
        EXPECT_EQ(dataset->LevelMax, 2u);
        EXPECT_EQ(dataset->PixelType, 2u);
        EXPECT_EQ(dataset->Interleave, 0);
        EXPECT_EQ(dataset->TileOrdering, ordering);
        EXPECT_EQ(dataset->BytesPerSample, 2u);
        EXPECT_EQ(dataset->TileDataEnd, made->TileDataEnd);
        EXPECT_EQ(dataset->TileScratch, nullptr);
        ReadRect(*dataset, 200, 200, 100, 100, BandList({0}), 0);
        EXPECT_EQ(dataset->TileScratch != nullptr, ordering < 2);
        EXPECT_TRUE(dataset->SourceName == path.c_str());
    }
}

TEST_F(DatasetFileTest, StoredMetaDocumentOffsetIsNotUsed) {
    PyramidModel model(Sample1000By777());
    for (std::size_t i = 12; i < 20; ++i) model.file[i] = 0xEE;
    model.Save(path);
    const auto dataset = Open();
    ASSERT_TRUE(dataset);
    EXPECT_EQ(dataset->MetaDocumentOffset, model.tileDataEnd);
}

TEST_F(DatasetFileTest, UnknownOrderingWordIsScanline) {
    auto d = Sample1000By777();
    d.ordering = 7;
    PyramidModel(d).Save(path);
    const auto dataset = Open();
    ASSERT_TRUE(dataset);
    EXPECT_EQ(dataset->TileOrdering, 0u);
}

TEST_F(DatasetFileTest, FileThatCannotBeWrittenOpensForReading) {
    PyramidModel model(Sample1000By777());
    model.StoreAllImages();
    model.Save(path);
    std::filesystem::permissions(path, std::filesystem::perms::owner_read);
    const auto dataset = Open();
    ASSERT_TRUE(dataset);
    // The superuser may write everything.
    EXPECT_EQ(dataset->Writable, access(path.c_str(), W_OK) == 0);
    EXPECT_TRUE(dataset->HasPyramid);
}

TEST_F(DatasetFileTest, MissingFileAndOtherFilesDoNotOpen) {
    EXPECT_FALSE(Open());
    for (const char* content : {"", "KOB", "KOBX", "KOBT", "KOBT0123456789", "II*\0........"}) {
        std::ofstream(path, std::ios::trunc) << content;
        EXPECT_FALSE(Open()) << content;
    }
    PyramidDataset other(zelm::String(path.c_str()));
    std::ofstream(path, std::ios::trunc) << std::string(100, 'x');
    EXPECT_TRUE(other.ReadHeader());
    EXPECT_TRUE(other.File) << "stays open until the dataset goes";
}

TEST_F(DatasetFileTest, DirectoriesAndPipesDoNotOpen) {
    ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
    EXPECT_FALSE(Open());
    PyramidDataset folder(zelm::String(directory.c_str()));
    EXPECT_TRUE(folder.ReadHeader());
}

TEST_F(DatasetFileTest, EveryTruncationIsAnsweredCleanly) {
    PyramidModel model(Sample1000By777());
    const std::uint64_t header = model.tileDataStart;
    model.StoreImage(2, model.Image(2));
    const Bytes whole = model.file;
    for (std::size_t size = 0; size < header; size += size < 40 ? 1 : 5) {
        model.file.assign(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(size));
        model.Save(path);
        EXPECT_FALSE(Open()) << size;
    }
    model.file.assign(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(header) + 1000);
    model.Save(path);
    const auto dataset = Open();
    ASSERT_TRUE(dataset);
    EXPECT_FALSE(dataset->HasPyramid);
    // The part that is there reads; the rest of the work buffer is zeros.
    EXPECT_EQ(ReadRect(*dataset, 0, 0, 250, 194, BandList({0, 1, 2}), 2),
              model.ReadTile(0, 0, 250, 194, {0, 1, 2}, 2));
}

TEST_F(DatasetFileTest, EmptyHeaderRegionIsRefused) {
    PyramidModel model(Sample1000By777());
    model.file[4] = 20;
    for (std::size_t i = 5; i < 12; ++i) model.file[i] = 0;
    model.Save(path);
    EXPECT_FALSE(Open());
}

TEST_F(DatasetFileTest, TileDataStartOutsideTheFileIsRefused) {
    PyramidModel model(Sample1000By777());
    for (const int high : {0x00, 0x01, 0x7F, 0x80, 0xFF}) {
        for (std::size_t i = 4; i < 12; ++i) model.file[i] = static_cast<unsigned char>(high);
        model.Save(path);
        EXPECT_FALSE(Open()) << high;
    }
}

TEST_F(DatasetFileTest, TileSizeZeroIsRefused) {
    auto d = Sample1000By777();
    PyramidModel model(d);
    const std::string from = "<HEADER_TILESIZE>256<";
    const auto at = std::search(model.file.begin(), model.file.end(), from.begin(), from.end());
    std::copy_n("<HEADER_TILESIZE>000<", from.size(), at);
    model.Save(path);
    EXPECT_FALSE(Open());
}

TEST_F(DatasetFileTest, TilesAboveTheLimitOpenAndRefuseTransfers) {
    auto d = Sample1000By777();
    d.tile = 2049;
    for (d.ordering = 0; d.ordering < 3; ++d.ordering) {
        PyramidModel(d).Save(path);
        const auto size = FileSize();
        const auto dataset = Open();
        ASSERT_TRUE(dataset);
        EXPECT_TRUE(dataset->File);
        EXPECT_FALSE(dataset->LevelOffsets);
        EXPECT_FALSE(dataset->HasPyramid) << "opening ends before it looks";
        EXPECT_TRUE(dataset->RefreshPyramidState());
        EXPECT_TRUE(dataset->HasPyramid) << "any file is longer than no tiles at all";
        EXPECT_FALSE(dataset->AcceptsTile(0, 0, 10, 10, BandList({0}).View(), 0));
        Bytes buffer(100, 7);
        EXPECT_FALSE(ReadBytes(*dataset, 0, 0, 10, 10, BandList({0}), 0, buffer));
        EXPECT_EQ(buffer, Bytes(100, 7));
        EXPECT_FALSE(WriteBytes(*dataset, 0, 0, 10, 10, BandList({0}), 0, buffer));
        EXPECT_EQ(FileSize(), size);
    }
}

TEST_F(DatasetFileTest, TilesOf2048AreServed) {
    auto d = Sample1000By777();
    d.tile = 2048;
    PyramidModel model(d);
    model.StoreAllImages();
    model.Save(path);
    const auto dataset = Open();
    ASSERT_TRUE(dataset);
    EXPECT_EQ(ReadRect(*dataset, 3, 5, 900, 700, BandList({0, 1, 2}), 0),
              Crop(model.Image(0), 1000, 3, 3, 5, 900, 700));
}

// Headers of some 600 bytes that announce the world: each is answered at once.
TEST_F(DatasetFileTest, HostileHeadersAreAnsweredFast) {
    const std::uint32_t huge = 0x7FFFFFFF;
    struct Case {
        std::uint32_t samples, lines, bands, tile, levelMin, levelMax, type, ordering;
        bool opens;
    };
    const std::vector<Case> cases{
        {huge, huge, huge, 256, 0, 8, 9, 0, false},  // tile data beyond 64 bits
        {huge, huge, 1, 1, 0, 0, 1, 0, true},        // no table is needed
        {huge, huge, 1, 1, 0, 0, 1, 2, false},       // beyond the curve
        {65536, 65536, 1, 1, 0, 0, 1, 2, false},     // a table of 32 GiB
        {65536, 6000, 1, 1, 0, 0, 1, 2, true},       // a table of 3 GiB, not built yet
        {1, 1, 1, 256, 0, 1023, 1, 2, true},         // as many levels as there may be
        {1, 1, 1, 256, 0, 1024, 1, 0, false},        // one more
        {1, 1, 1, 256, 0, 0xFFFFFFFF, 1, 0, false},  // LevelMax + 1 is 0
        {1, 1, 1, 256, 5, 3, 1, 0, true},            // no level at all
        {1, 1, huge, 256, 0, 0, 1, 2, false},        // a table of bands
        {0, 0, huge, 256, 0, 1023, 1, 2, false},     // the same, without tiles
        {1, 1, huge, 256, 0, 0, 9, 0, true},         // a work buffer of 2^52 bytes
        {0xFFFFFFFF, 16, 1, 256, 0, 0, 1, 2, true},  // the tile count wraps to 0
    };
    for (const Case& c : cases) {
        PyramidDescription d;
        d.samples = c.samples;
        d.lines = c.lines;
        d.bands = c.bands;
        d.tile = c.tile;
        d.levelMin = c.levelMin;
        d.levelMax = 0;  // the model lays out nothing large
        d.type = c.type;
        d.ordering = 0;
        PyramidModel model(d);
        const auto patch = [&](const std::string& from, const std::string& to) {
            std::string text(model.file.begin() + 20, model.file.end());
            text.replace(text.find(from), from.size(), to);
            model.file.resize(20);
            model.file.insert(model.file.end(), text.begin(), text.end());
            for (std::size_t i = 0; i < 8; ++i)
                model.file[4 + i] = static_cast<unsigned char>(model.file.size() >> (8 * i));
        };
        patch("<HEADER_LEVELMAX>0<", "<HEADER_LEVELMAX>" + std::to_string(c.levelMax) + "<");
        patch("Scanline", c.ordering == 2 ? "Morton" : "Blocked");
        model.Save(path);
        const ProcessorTime time;
        const auto dataset = Open();
        EXPECT_EQ(dataset != nullptr, c.opens) << c.samples << " " << c.bands << " " << c.levelMax;
        if (dataset) {
            Bytes buffer(1, 7);
            // Whatever a tile of such a file is, asking beyond the level is refused.
            EXPECT_FALSE(ReadBytes(*dataset, c.samples, 0, 1, 1, BandList({0}), 0, buffer));
            EXPECT_EQ(buffer[0], 7);
        }
        EXPECT_LT(time.Seconds(), 5);
    }
}

TEST_F(DatasetFileTest, LargeTileTableIsBuiltWithTheFirstTile) {
    PyramidDescription d;
    d.tile = 1;
    d.samples = 400;
    d.lines = 300;  // 960 kB of table
    d.ordering = 2;
    const auto dataset = Create(d);
    EXPECT_EQ(dataset->TileOffsets.data, nullptr);
    EXPECT_TRUE(WriteBytes(*dataset, 399, 299, 1, 1, BandList({0}), 0, Bytes{42}));
    EXPECT_NE(dataset->TileOffsets.data, nullptr);
    EXPECT_TRUE(dataset->RefreshPyramidState());
    EXPECT_TRUE(dataset->HasPyramid);
    EXPECT_EQ(ReadRect(*dataset, 399, 299, 1, 1, BandList({0}), 0), Bytes{42});
}

TEST_F(DatasetFileTest, AVeryLargeTileTableIsNeverBuilt) {
    PyramidDescription d;
    d.tile = 1;
    d.samples = 2000;
    d.lines = 1500;  // 72 MB of table
    d.bands = 3;
    d.ordering = 2;
    const auto dataset = Create(d);
    EXPECT_TRUE(WriteBytes(*dataset, 1999, 1499, 1, 1, BandList({0, 1, 2}), 0, Bytes{42, 43, 44}));
    EXPECT_TRUE(WriteBytes(*dataset, 1, 0, 1, 1, BandList({2, 0, 1}), 0, Bytes{7, 8, 9}));
    EXPECT_EQ(dataset->TileOffsets.data, nullptr);
    EXPECT_TRUE(dataset->RefreshPyramidState());
    EXPECT_TRUE(dataset->HasPyramid);
    EXPECT_EQ(ReadRect(*dataset, 1999, 1499, 1, 1, BandList({0, 1, 2}), 0), (Bytes{42, 43, 44}));
    EXPECT_EQ(ReadRect(*dataset, 1, 0, 1, 1, BandList({0, 1, 2}), 0), (Bytes{8, 9, 7}));
}

TEST_F(DatasetFileTest, MortonWalkEndsAtTheEndOfTheTileData) {
    auto d = Sample1000By777();
    d.bands = 2;
    d.type = 2;
    d.levelMax = 1;
    d.ordering = 2;
    const auto dataset = Create(d);
    EXPECT_EQ(dataset->TileCursor, dataset->TileDataStart + 3884000);
    EXPECT_EQ(dataset->TileDataEnd, dataset->TileCursor);
}

TEST_F(DatasetFileTest, MortonLevelNineIsCreatedWithoutComplaint) {
    PyramidDescription d;
    d.samples = d.lines = 1024;
    d.levelMax = 9;
    d.ordering = 2;
    const auto dataset = Create(d);
    EXPECT_TRUE(dataset->File);
    EXPECT_EQ(dataset->LevelMax, 9u);
    EXPECT_TRUE(dataset->AcceptsTile(0, 0, 4, 4, BandList({0}).View(), 8));
    EXPECT_FALSE(dataset->AcceptsTile(0, 0, 2, 2, BandList({0}).View(), 9));
    EXPECT_TRUE(WriteBytes(*dataset, 0, 0, 4, 4, BandList({0}), 8, Bytes(16, 9)));
    EXPECT_EQ(ReadRect(*dataset, 0, 0, 4, 4, BandList({0}), 8), Bytes(16, 9));
    // The level table counts level 9, which the walk has not placed.
    EXPECT_EQ(dataset->TileDataEnd, dataset->TileCursor + 4);
}

TEST_F(DatasetFileTest, FileMayStartAtAHigherLevel) {
    auto d = Sample1000By777();
    d.levelMin = d.levelMax = 2;
    const auto dataset = Create(d);
    EXPECT_EQ(dataset->LevelOffsets[2], dataset->TileDataStart);
    EXPECT_EQ(dataset->TileDataEnd, dataset->TileDataStart + 250 * 194 * 3);
    EXPECT_EQ(dataset->LevelCount, 1u);
    EXPECT_EQ(dataset->LevelOffsets[0], 0u);
    EXPECT_FALSE(dataset->AcceptsTile(0, 0, 1, 1, BandList({0}).View(), 0));
    EXPECT_FALSE(dataset->AcceptsTile(0, 0, 1, 1, BandList({0}).View(), 1));
    EXPECT_TRUE(dataset->AcceptsTile(0, 0, 1, 1, BandList({0}).View(), 2));
    EXPECT_FALSE(dataset->AcceptsTile(0, 0, 1, 1, BandList({0}).View(), 3));
    EXPECT_FALSE(dataset->AcceptsTile(0, 0, 1, 1, BandList({0}).View(), -1));
}

TEST_F(DatasetFileTest, LevelMinAboveLevelMaxLaysOutNothing) {
    auto d = Sample1000By777();
    d.levelMin = 3;
    d.levelMax = 1;
    const auto dataset = Create(d);
    EXPECT_EQ(dataset->TileDataEnd, dataset->TileDataStart);
    EXPECT_EQ(dataset->LevelCount, 0xFFFFFFFFu);
    EXPECT_TRUE(dataset->HasPyramid);
    for (int level = 0; level < 4; ++level)
        EXPECT_FALSE(dataset->AcceptsTile(0, 0, 1, 1, BandList({0}).View(), level));
}

TEST_F(DatasetFileTest, LevelsThatShrinkToNothingAddNothing) {
    PyramidDescription d;
    d.samples = d.lines = 100;
    d.levelMin = 6;
    d.levelMax = 40;
    const auto dataset = Create(d);
    EXPECT_EQ(dataset->TileDataEnd, dataset->TileDataStart + 1);
    EXPECT_TRUE(dataset->AcceptsTile(0, 0, 1, 1, BandList({0}).View(), 6));
    for (const int level : {7, 31, 32, 38, 39, 40})
        EXPECT_FALSE(dataset->AcceptsTile(0, 0, 1, 1, BandList({0}).View(), level)) << level;
}

TEST_F(DatasetFileTest, CreatingEmptiesWhatWasThere) {
    PyramidModel model(Sample1000By777());
    model.StoreAllImages();
    model.Save(path);
    PyramidDescription d;
    d.samples = d.lines = 300;
    const auto dataset = Create(d);
    EXPECT_EQ(FileSize(), dataset->TileDataStart);
    EXPECT_FALSE(dataset->HasPyramid);
}

TEST_F(DatasetFileTest, FileThatCannotBeMadeChangesOnlyTheVersion) {
    path = directory / "no such folder" / "x.pyr";
    const auto dataset = Create(Sample1000By777());
    EXPECT_FALSE(dataset->File);
    EXPECT_EQ(dataset->VersionMajor, 1u);
    EXPECT_EQ(dataset->VersionMinor, 1u);
    EXPECT_EQ(dataset->LevelMax, 0u);
    EXPECT_FALSE(dataset->LevelOffsets);
}

TEST_F(DatasetFileTest, LevelsBeyondTheLimitsMakeNoFile) {
    auto d = Sample1000By777();
    d.levelMax = 1024;
    const auto dataset = Create(d);
    EXPECT_FALSE(dataset->File);
    EXPECT_FALSE(std::filesystem::exists(path));
    dataset->CreateFile(0, 0xFFFFFFFF);
    EXPECT_FALSE(dataset->File);
}

TEST_F(DatasetFileTest, DeleteClosesAndRemoves) {
    const auto dataset = Create(Sample1000By777());
    dataset->DeleteFile();
    EXPECT_FALSE(dataset->File);
    EXPECT_FALSE(dataset->HasPyramid);
    EXPECT_FALSE(std::filesystem::exists(path));
    EXPECT_FALSE(dataset->CheckPyramidComplete());
    dataset->DeleteFile();
}

TEST_F(DatasetFileTest, NamesOutsideAscii) {
    path = directory / u8"H\u00f6he \u6c34\u6df1 \U0001F30A.pyr";
    auto d = Sample1000By777();
    const auto made = Create(d);
    EXPECT_TRUE(made->File);
    EXPECT_TRUE(std::filesystem::exists(path));
    EXPECT_TRUE(Open());
    made->DeleteFile();
    EXPECT_FALSE(std::filesystem::exists(path));
}

}  // namespace
}  // namespace zmctest
