#include "pyramid/PyramidRasterReader.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <limits>
#include <vector>

#include "pyramid/PyramidDataConnection.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/ScratchDirectory.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {

using namespace zelm;
namespace {

constexpr std::int32_t kPair[] = {2, 2};

Array<String> Name(const std::string& name) {
    Array<String> parameters;
    parameters.Append(name.c_str());
    return parameters;
}

template <class T>
RasterReader<T>& ReaderOf(PyramidDataConnection& connection) {
    return *connection.GetReader()->template As<T>();
}

Array<int> Bands(std::vector<int>& bands) {
    if (bands.empty()) return {};
    return Array<int>(bands.data(), ArrayShape(static_cast<std::uint32_t>(bands.size())));
}

class PyramidReaderTest : public ::testing::Test {
protected:
    using Byte = unsigned char;

    // Describes a file of type T, without making it.
    template <class T = Byte>
    RasterReader<T>& Describe(std::uint32_t samples = 1000, std::uint32_t lines = 777,
                              std::uint32_t bands = 3, std::int32_t interleave = 0) {
        RasterProps props = PyramidProps(samples, lines, bands, ElementTraits<T>::code);
        props.interleave = interleave;
        connection.Reset(new PyramidDataConnection);
        EXPECT_TRUE(connection->Create(Name(name), props));
        return ReaderOf<T>(*connection);
    }
    template <class T = Byte>
    RasterReader<T>& Build(std::uint32_t samples = 1000, std::uint32_t lines = 777,
                           std::uint32_t bands = 3, std::int32_t maxLevel = 2) {
        RasterReader<T>& reader = Describe<T>(samples, lines, bands);
        EXPECT_TRUE(reader.BuildPyramid(0, maxLevel, 0, kPair));
        return reader;
    }
    void FinishFile() {
        std::filesystem::resize_file(name, connection->dataset->TileDataEnd);
        EXPECT_TRUE(connection->dataset->RefreshPyramidState());
    }

    zmctest::ScratchDirectory folder;
    std::string name = (folder / "reader.pyr");
    Pointer<PyramidDataConnection> connection;
};

TEST_F(PyramidReaderTest, Constants) {
    auto& reader = Build();
    EXPECT_TRUE(reader.IsValid());
    EXPECT_EQ(reader.GetCapabilities(), 7u);
    EXPECT_EQ(reader.GetBaseReduction(), 1u);
    EXPECT_EQ(reader.GetStatsMask(), 127u);
    EXPECT_TRUE(reader.CanBuildPyramid());
    EXPECT_TRUE(reader.CanStoreBandStats());
    EXPECT_TRUE(reader.CanStoreHistograms());
    EXPECT_TRUE(reader.SupportsNoData());
    EXPECT_FALSE(reader.ReservedReaderQuery());
    EXPECT_TRUE(reader.IsValidLevel(0));
    EXPECT_TRUE(reader.IsValidLevel(99));
    EXPECT_EQ(reader.GetConnection(), connection.Get());
}

TEST_F(PyramidReaderTest, PropertiesTellTheDataset) {
    auto& reader = Describe<Byte>(1000, 777, 3, 2);
    const RasterProps props = reader.GetRasterProps();
    EXPECT_EQ(props.samples, 1000u);
    EXPECT_EQ(props.lines, 777u);
    EXPECT_EQ(props.bands, 3u);
    EXPECT_EQ(props.tileSamples, 256u);
    EXPECT_EQ(props.tileLines, 256u);
    EXPECT_EQ(props.interleave, 2);
    EXPECT_EQ(props.pixelType, 1u);
    EXPECT_TRUE(props.formatName == "Unknown");
    EXPECT_FALSE(props.geoRef);
    EXPECT_TRUE(props.noDataValues.empty());
}

TEST_F(PyramidReaderTest, ReaderWithoutAConnectionIsNotValid) {
    PyramidRasterReader<Byte> reader(nullptr, GeoRefPtr(), MetadataPtr());
    EXPECT_FALSE(reader.IsValid());
    EXPECT_FALSE(reader.IsValidLevel(0));
    EXPECT_EQ(reader.GetMinLevel(), 0);
    EXPECT_EQ(reader.GetMaxLevel(), 0);
    EXPECT_FALSE(reader.HasPyramid());
    EXPECT_FALSE(reader.BuildPyramid(0, 1, 0, kPair));
    EXPECT_FALSE(reader.DeletePyramid());
    EXPECT_FALSE(reader.RefreshPyramidState());
    EXPECT_FALSE(reader.HasBandStats(0));
    EXPECT_FALSE(reader.HasPalette(0));
    EXPECT_TRUE(reader.GetPalette(0));
    EXPECT_FALSE(reader.SetPalette(0, Palette()));
    EXPECT_FALSE(reader.SetBandStats({}));
    EXPECT_FALSE(reader.SetHistograms({}));
    EXPECT_EQ(reader.GetHistograms().shape.elements, 0u);
    EXPECT_EQ(reader.GetBandStats(0).flags, 0u);
    Byte pixel = 9, mask = 0xFF;
    EXPECT_FALSE(reader.ReadTile(0, 0, 1, 1, {}, 0, &pixel, &mask));
    EXPECT_FALSE(reader.WriteTile(0, 0, 1, 1, {}, 0, &pixel, &mask));
    EXPECT_EQ(pixel, 9);
    EXPECT_EQ(mask, 0xFF);
}

TEST_F(PyramidReaderTest, SizesOfLevelsNeedACompletePyramid) {
    auto& reader = Build(1001, 513, 1, 2);
    EXPECT_EQ(reader.GetSamples(-1), 1001u);
    EXPECT_EQ(reader.GetSamples(0), 1001u);
    EXPECT_EQ(reader.GetSamples(1), 1001u);
    EXPECT_EQ(reader.GetLevelReduction(), 0u);
    EXPECT_FALSE(reader.HasPyramid());
    FinishFile();
    EXPECT_TRUE(reader.HasPyramid());
    EXPECT_EQ(reader.GetLevelReduction(), 2u);
    EXPECT_EQ(reader.GetSamples(-1), 1001u);
    EXPECT_EQ(reader.GetSamples(1), 500u);
    EXPECT_EQ(reader.GetLines(1), 256u);
    EXPECT_EQ(reader.GetSamples(2), 250u);
    EXPECT_EQ(reader.GetLines(2), 128u);
    EXPECT_EQ(reader.GetSamples(33), 500u) << "levels count modulo 32";
}

TEST_F(PyramidReaderTest, BuildWantsAPairOfEqualValues) {
    auto& reader = Describe();
    const std::int32_t different[] = {2, 3};
    EXPECT_FALSE(reader.BuildPyramid(0, 3, 0, different));
    EXPECT_FALSE(reader.BuildPyramid(0, 3, 0, nullptr));
    EXPECT_FALSE(std::filesystem::exists(name));
    EXPECT_TRUE(reader.BuildPyramid(0, 3, 99, kPair));
    EXPECT_TRUE(std::filesystem::exists(name));
    EXPECT_EQ(reader.GetMinLevel(), 0);
    EXPECT_EQ(reader.GetMaxLevel(), 3);
    EXPECT_FALSE(reader.HasPyramid());
    const std::string before = zmctest::ReadText(name);
    EXPECT_FALSE(reader.BuildPyramid(0, 1, 0, different));
    EXPECT_EQ(zmctest::ReadText(name), before);
    EXPECT_EQ(reader.GetMaxLevel(), 3);
}

TEST_F(PyramidReaderTest, BuildIsTrueEvenWhereNoFileCanBeMade) {
    name = (folder / "missing/folder.pyr");
    auto& reader = Describe();
    EXPECT_TRUE(reader.BuildPyramid(0, 1, 0, kPair));
    EXPECT_FALSE(std::filesystem::exists(name));
}

TEST_F(PyramidReaderTest, BuildEmptiesAnExistingPyramid) {
    auto& reader = Build(300, 300, 1, 0);
    FinishFile();
    EXPECT_TRUE(reader.BuildPyramid(0, 0, 0, kPair));
    EXPECT_FALSE(reader.HasPyramid());
    EXPECT_EQ(std::filesystem::file_size(name), connection->dataset->TileDataStart);
}

TEST_F(PyramidReaderTest, DeleteClosesAndRemoves) {
    auto& reader = Build();
    FinishFile();
    EXPECT_TRUE(reader.DeletePyramid());
    EXPECT_FALSE(std::filesystem::exists(name));
    EXPECT_FALSE(reader.HasPyramid());
    EXPECT_EQ(connection->dataset->File, nullptr);
    EXPECT_TRUE(reader.DeletePyramid()) << "whether there was a file or not";
}

TEST_F(PyramidReaderTest, WithoutAFileTilesAreTrueAndMoveNothing) {
    auto& reader = Describe<float>(10, 10, 1);
    float pixels[] = {1, std::numeric_limits<float>::infinity()};
    Byte mask[] = {0xFF, 0};
    std::vector<int> list{0};
    EXPECT_TRUE(reader.ReadTile(0, 0, 2, 1, Bands(list), 0, pixels, mask));
    EXPECT_EQ(pixels[0], 1);
    EXPECT_EQ(mask[0], 0xFE) << "the mask of what the buffer holds";
    EXPECT_EQ(mask[1], 1);
    EXPECT_TRUE(reader.WriteTile(0, 0, 2, 1, Bands(list), 0, pixels, mask));
}

TEST_F(PyramidReaderTest, RefusalsLeaveBufferAndMask) {
    auto& reader = Build(1000, 777, 3, 2);
    RasterProps source;
    source.SetBands(3);
    source.SetNoDataValue(0, 5);
    reader.SetNoDataValues(source);
    const std::string before = zmctest::ReadText(name);
    struct Request {
        std::int32_t x, y;
        std::uint32_t width, height;
        std::vector<int> list;
        std::int32_t level;
    };
    const std::vector<int> all{0, 1, 2};
    const Request requests[] = {
        {-1, 0, 4, 4, all, 0},       {0, -1, 4, 4, all, 0},   {997, 0, 4, 4, all, 0},
        {0, 774, 4, 4, all, 0},      {0, 0, 1001, 1, all, 0}, {0, 0, 4, 4, {0, 3, 1}, 0},
        {0, 0, 4, 4, {0, -1, 1}, 0}, {0, 0, 4, 4, all, 3},    {0, 0, 4, 4, all, -1},
        {0, 0, 4, 4, all, 32},       {497, 0, 4, 4, all, 1},  {0, 0, 0xFFFFFFFFu, 2, all, 0},
    };
    for (Request request : requests) {
        std::vector<Byte> pixels(4096, 9), mask(4096, 0xFF);
        const Array<int> list = Bands(request.list);
        EXPECT_FALSE(reader.ReadTile(request.x, request.y, request.width, request.height, list,
                                     request.level, pixels.data(), mask.data()));
        EXPECT_FALSE(reader.WriteTile(request.x, request.y, request.width, request.height, list,
                                      request.level, pixels.data(), mask.data()));
        EXPECT_EQ(pixels, std::vector<Byte>(4096, 9)) << "not even stamped";
        EXPECT_EQ(mask, std::vector<Byte>(4096, 0xFF));
    }
    EXPECT_EQ(zmctest::ReadText(name), before);
}

TEST_F(PyramidReaderTest, EmptyTilesAndNullBuffers) {
    auto& reader = Build(10, 10, 1, 0);
    std::vector<int> list{0};
    Byte pixel = 9, mask = 0xFF;
    for (const std::int32_t place : {0, -5, 99}) {
        EXPECT_TRUE(reader.ReadTile(place, 0, 0, 1, Bands(list), 0, &pixel, &mask));
        EXPECT_TRUE(reader.WriteTile(0, place, 1, 0, Bands(list), 77, &pixel, &mask));
    }
    EXPECT_FALSE(reader.ReadTile(0, 0, 1, 1, Bands(list), 0, nullptr, &mask));
    EXPECT_FALSE(reader.WriteTile(0, 0, 1, 1, Bands(list), 0, nullptr, &mask));
    EXPECT_FALSE(reader.WriteTile(0, 0, 1, 1, Bands(list), 0, &pixel, nullptr));
    EXPECT_EQ(pixel, 9);
    EXPECT_EQ(mask, 0xFF);
    EXPECT_TRUE(reader.ReadTile(0, 0, 1, 1, Bands(list), 0, &pixel, nullptr));
    EXPECT_EQ(pixel, 0) << "what cannot be read is zero";
}

TEST_F(PyramidReaderTest, EmptyBandListInMortonOrderIsRefused) {
    auto& reader = Build(300, 300, 9, 0);
    ASSERT_EQ(connection->dataset->TileOrdering, 2u);
    std::vector<Byte> pixels(9, 7);
    Byte mask[9] = {};
    EXPECT_FALSE(reader.ReadTile(0, 0, 1, 1, {}, 0, pixels.data(), mask));
    EXPECT_FALSE(reader.WriteTile(0, 0, 1, 1, {}, 0, pixels.data(), mask));
    EXPECT_EQ(pixels, std::vector<Byte>(9, 7));
}

TEST_F(PyramidReaderTest, TooLargeTilesOpenAndAreRefused) {
    HeaderText header;
    header.tileSize = 2049;
    zmctest::WriteText(name, header.File());
    PyramidDataConnection opened;
    ASSERT_TRUE(opened.Open(Name(name), GeoRefPtr(), MetadataPtr()));
    auto& reader = ReaderOf<Byte>(opened);
    Byte pixel = 9, mask = 0xFF;
    EXPECT_FALSE(reader.ReadTile(0, 0, 1, 1, {}, 0, &pixel, &mask));
    EXPECT_FALSE(reader.WriteTile(0, 0, 1, 1, {}, 0, &pixel, &mask));
    EXPECT_EQ(pixel, 9);
    EXPECT_EQ(mask, 0xFF);
}

TEST_F(PyramidReaderTest, WritingStampsTheBufferAndTheFile) {
    auto& reader = Build(4, 1, 1, 0);
    RasterProps source;
    source.SetBands(1);
    source.SetNoDataValue(0, 200);
    reader.SetNoDataValues(source);
    std::vector<int> list{0};
    Byte pixels[] = {1, 2, 3, 4};
    const Byte mask[] = {0, 1, 0xFE, 0xFF};
    Byte given[4];
    std::copy(mask, mask + 4, given);
    EXPECT_TRUE(reader.WriteTile(0, 0, 4, 1, Bands(list), 0, pixels, given));
    EXPECT_EQ(std::vector<Byte>(pixels, pixels + 4), (std::vector<Byte>{1, 200, 3, 200}));
    EXPECT_TRUE(std::equal(mask, mask + 4, given));
    Byte read[4] = {}, found[4] = {0xFE, 0xFE, 3, 0};
    EXPECT_TRUE(reader.ReadTile(0, 0, 4, 1, Bands(list), 0, read, found));
    EXPECT_TRUE(std::equal(pixels, pixels + 4, read));
    EXPECT_EQ(std::vector<Byte>(found, found + 4), (std::vector<Byte>{0xFE, 0xFF, 2, 1}));
    EXPECT_EQ(static_cast<Byte>(zmctest::ReadText(name).back()), 200);
}

TEST_F(PyramidReaderTest, ReadOnlyFilesDropTheirWritesAndStillStamp) {
    auto& reader = Build(2, 1, 1, 0);
    FinishFile();
    const std::string before = zmctest::ReadText(name);
    connection->dataset->Writable = false;
    RasterProps source;
    source.SetBands(1);
    source.SetNoDataValue(0, 5);
    reader.SetNoDataValues(source);
    Byte pixels[] = {1, 2}, mask[] = {1, 0};
    EXPECT_TRUE(reader.WriteTile(0, 0, 2, 1, {}, 0, pixels, mask));
    EXPECT_EQ(pixels[0], 1) << "an empty list names no band to stamp";
    std::vector<int> list{0};
    EXPECT_TRUE(reader.WriteTile(0, 0, 2, 1, Bands(list), 0, pixels, mask));
    EXPECT_EQ(pixels[0], 5);
    RasterBandStats<Byte> stats;
    Array<RasterBandStats<Byte>> array;
    array.Append(stats);
    EXPECT_TRUE(reader.SetBandStats(array));
    EXPECT_FALSE(reader.HasBandStats(0));
    EXPECT_TRUE(reader.SetHistograms({}));
    Palette palette;
    palette.nextIndex = 1;
    EXPECT_TRUE(reader.SetPalette(0, palette));
    EXPECT_FALSE(reader.HasPalette(0));
    EXPECT_EQ(zmctest::ReadText(name), before);
}

TEST_F(PyramidReaderTest, NoDataValuesLiveInTheReaderAlone) {
    auto& reader = Build(10, 10, 3, 0);
    RasterProps source;
    source.SetBands(5);
    source.SetNoDataValue(0, 1);
    source.SetNoDataValue(2, 3);
    source.SetNoDataValue(4, 5);
    reader.SetNoDataValues(source);
    EXPECT_EQ(reader.GetRasterProps().noDataValues,
              (std::map<std::uint32_t, double>{{0, 1}, {2, 3}}));
    EXPECT_FALSE(reader.HasNoDataValue(1));
    EXPECT_FALSE(reader.HasNoDataValue(4));
    source.SetBands(1);
    reader.SetNoDataValues(source);
    EXPECT_EQ(reader.GetRasterProps().noDataValues, (std::map<std::uint32_t, double>{{0, 1}}));
    PyramidDataConnection second;
    ASSERT_TRUE(second.Open(Name(name), GeoRefPtr(), MetadataPtr()));
    EXPECT_TRUE(second.GetRasterProps().noDataValues.empty());
}

template <class T>
T NoDataOf(PyramidRasterReader<T>& reader, double value) {
    reader.props.noDataValues[0] = value;
    return reader.GetNoDataValue(0);
}

template <class T>
T SevenPointNine() {
    if constexpr (kIsComplex<T>)
        return T(static_cast<decltype(T::re)>(7.9), 0);
    else
        return static_cast<T>(7.9);
}

TEST_F(PyramidReaderTest, NoDataValuesAreTruncatedAndCut) {
    ForEachElementType([this](auto type) {
        using T = typename decltype(type)::type;
        SCOPED_TRACE(ElementTraits<T>::word);
        auto& reader = dynamic_cast<PyramidRasterReader<T>&>(Describe<T>(1, 1, 1));
        EXPECT_TRUE(reader.GetNoDataValue(0) == T());
        EXPECT_TRUE(NoDataOf(reader, 7.9) == SevenPointNine<T>());
        EXPECT_TRUE(reader.GetNoDataValue(1) == T()) << "no such band";
    });
}

TEST_F(PyramidReaderTest, NoDataValuesBeyondTheType) {
    auto& byte = dynamic_cast<PyramidRasterReader<Byte>&>(Describe<Byte>(1, 1, 1));
    EXPECT_EQ(NoDataOf(byte, 300.0), 44);
    EXPECT_EQ(NoDataOf(byte, -1.0), 255);
    // The signed types go through 32 bits, where a larger number has no place; the others do not.
    auto& integer = dynamic_cast<PyramidRasterReader<int>&>(Describe<int>(1, 1, 1));
    EXPECT_EQ(NoDataOf(integer, 4294967297.0), std::numeric_limits<int>::min());
    auto& natural = dynamic_cast<PyramidRasterReader<unsigned>&>(Describe<unsigned>(1, 1, 1));
    EXPECT_EQ(NoDataOf(natural, 4294967297.0), 1u);
    auto& small = dynamic_cast<PyramidRasterReader<short>&>(Describe<short>(1, 1, 1));
    EXPECT_EQ(NoDataOf(small, 65537.0), 1);
    auto& wide =
        dynamic_cast<PyramidRasterReader<std::uint64_t>&>(Describe<std::uint64_t>(1, 1, 1));
    EXPECT_EQ(NoDataOf(wide, 13835058055282163712.0), 13835058055282163712u);
}

TEST_F(PyramidReaderTest, RecordsThroughTheReader) {
    auto& reader = Build(10, 10, 2, 0);
    EXPECT_FALSE(reader.HasBandStats(0));
    EXPECT_FALSE(reader.HasPalette(0));
    Array<RasterBandStats<Byte>> stats;
    for (std::uint32_t band = 0; band < 2; ++band) {
        RasterBandStats<Byte> record;
        record.band = band;
        record.flags = StatsFlag::Minimum;
        record.minimum = static_cast<Byte>(band + 10);
        stats.Append(record);
    }
    EXPECT_TRUE(reader.SetBandStats(stats));
    Array<RasterBandHistogram<Byte>> histograms;
    histograms.Append({});
    EXPECT_TRUE(reader.SetHistograms(histograms));
    Palette palette;
    palette.AddColor(Color());
    EXPECT_TRUE(reader.SetPalette(1, palette));
    EXPECT_TRUE(reader.HasBandStats(1));
    EXPECT_EQ(reader.GetBandStats(1).minimum, 11);
    EXPECT_EQ(reader.GetBandStats(4294967295u).flags, 0u);
    EXPECT_EQ(reader.GetHistograms().shape.elements, 1u);
    EXPECT_TRUE(reader.HasPalette(1));
    EXPECT_FALSE(reader.HasPalette(0));
    EXPECT_EQ(reader.GetPalette(1)->nextIndex, 1u);
}

TEST_F(PyramidReaderTest, ReaderOutlivesItsConnection) {
    Build(10, 10, 1, 0);
    FinishFile();
    const RasterReaderDispatchPtr dispatch = connection->GetReader();
    connection.Reset();
    const auto& reader = dispatch->As<Byte>();
    Byte pixel = 9;
    EXPECT_TRUE(reader->ReadTile(0, 0, 1, 1, {}, 0, &pixel, nullptr));
    EXPECT_EQ(pixel, 0);
    EXPECT_TRUE(reader->HasPyramid());
}

// --- the filling contract ---

TEST_F(PyramidReaderTest, LevelsOfAFilledFile) {
    auto& reader = Build(1001, 513, 1, 2);
    EXPECT_EQ(reader.GetMaxLevel(), 2);
    std::vector<int> list{0};
    const std::uint32_t sizes[][2] = {{1001, 513}, {500, 256}, {250, 128}};
    for (std::int32_t level = 2; level >= 0; --level) {
        const auto [width, height] = sizes[static_cast<std::size_t>(level)];
        for (std::uint32_t y = 0; y < height; y += 256) {
            for (std::uint32_t x = 0; x < width; x += 256) {
                const std::uint32_t w = std::min(256u, width - x), h = std::min(256u, height - y);
                std::vector<Byte> tile(std::size_t{w} * h), mask(tile.size());
                std::fill(tile.begin(), tile.end(),
                          static_cast<Byte>(static_cast<std::uint32_t>(level) * 50 + x / 256 + 1));
                ASSERT_TRUE(reader.WriteTile(static_cast<int>(x), static_cast<int>(y), w, h,
                                             Bands(list), level, tile.data(), mask.data()));
            }
        }
    }
    EXPECT_FALSE(reader.HasPyramid()) << "nobody has looked yet";
    EXPECT_TRUE(reader.RefreshPyramidState());
    EXPECT_TRUE(reader.HasPyramid());
    for (std::int32_t level = 0; level < 3; ++level) {
        const std::uint32_t width = reader.GetSamples(level), height = reader.GetLines(level);
        ASSERT_EQ(width, sizes[static_cast<std::size_t>(level)][0]);
        ASSERT_EQ(height, sizes[static_cast<std::size_t>(level)][1]);
        std::vector<Byte> all(std::size_t{width} * height);
        ASSERT_TRUE(reader.ReadTile(0, 0, width, height, Bands(list), level, all.data(), nullptr));
        for (std::size_t i = 0; i < all.size(); ++i)
            ASSERT_EQ(all[i], static_cast<std::size_t>(level) * 50 + i % width / 256 + 1)
                << level << ": " << i;
    }
}

TEST_F(PyramidReaderTest, FileThatStartsAtAHigherLevel) {
    auto& reader = Describe(1000, 777, 1);
    EXPECT_TRUE(reader.BuildPyramid(2, 2, 0, kPair));
    EXPECT_EQ(reader.GetMinLevel(), 2);
    EXPECT_EQ(connection->dataset->LevelOffsets[2], connection->dataset->TileDataStart);
    EXPECT_EQ(connection->dataset->TileDataEnd - connection->dataset->TileDataStart, 250u * 194u);
    Byte pixel = 9, mask = 0;
    EXPECT_TRUE(reader.ReadTile(0, 0, 1, 1, {}, 2, &pixel, &mask));
    EXPECT_FALSE(reader.ReadTile(0, 0, 1, 1, {}, 0, &pixel, &mask)) << "no room for that level";
}

TEST_F(PyramidReaderTest, LevelsThatHaveShrunkToNothing) {
    auto& reader = Build(100, 100, 1, 7);
    const std::uint64_t* offsets = connection->dataset->LevelOffsets.get();
    EXPECT_EQ(offsets[7], offsets[6]) << "level 7 takes no place";
    EXPECT_EQ(offsets[5], offsets[6] + 1) << "level 6 is one pixel";
    Byte pixel = 3, mask = 0;
    EXPECT_TRUE(reader.WriteTile(0, 0, 1, 1, {}, 6, &pixel, &mask));
    EXPECT_FALSE(reader.ReadTile(0, 0, 1, 1, {}, 7, &pixel, &mask));
}

TEST_F(PyramidReaderTest, MortonLevelsBeyondTheTileSizeAreLaidOutAndRefused) {
    auto& reader = Build(1024, 1024, 9, 9);
    EXPECT_EQ(reader.GetMaxLevel(), 9);
    std::vector<int> list{0};
    std::vector<Byte> pixels(16, 5), mask(16);
    EXPECT_TRUE(reader.WriteTile(0, 0, 4, 4, Bands(list), 8, pixels.data(), mask.data()));
    std::vector<Byte> read(16);
    EXPECT_TRUE(reader.ReadTile(0, 0, 4, 4, Bands(list), 8, read.data(), nullptr));
    EXPECT_EQ(read, pixels);
    EXPECT_FALSE(reader.ReadTile(0, 0, 2, 2, Bands(list), 9, read.data(), nullptr));
}

TEST_F(PyramidReaderTest, LevelsTheWrongWayRoundHoldNothing) {
    auto& reader = Describe(10, 10, 1);
    EXPECT_TRUE(reader.BuildPyramid(2, 1, 0, kPair));
    Byte pixel = 9, mask = 0;
    for (const int level : {0, 1, 2})
        EXPECT_FALSE(reader.ReadTile(0, 0, 1, 1, {}, level, &pixel, &mask));
    EXPECT_EQ(connection->dataset->TileDataEnd, connection->dataset->TileDataStart);
}

}  // namespace
}  // namespace zmctest
