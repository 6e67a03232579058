#include "raster/ReaderRasterMemory.h"

#include <gtest/gtest.h>

#include <memory>

#include "connection/MemoryRasterDataConnection.h"
#include "tests/support/ElementTypeList.h"
#include "tests/support/MemoryRaster.h"
#include "tests/support/TileModel.h"

namespace zmctest {

using namespace zelm;
namespace {

// A raster of 4 samples, 3 lines and 3 bands, whose reader is at hand.
template <class T>
class Opened {
public:
    explicit Opened(std::int32_t interleave = Interleave::BSQ)
        : pixels(Samples<T>(4 * 3 * 3)), connection(new MemoryRasterDataConnection) {
        MemoryRasterText text(pixels.data());
        text.Size(4, 3, 3).Layout(interleave).Type(ElementTraits<T>::code);
        EXPECT_TRUE(connection->Open(Argument({text.Text()}), GeoRefPtr(), MetadataPtr()));
        dispatch = connection->GetReader();
    }
    RasterReader<T>& Reader() { return *dispatch->template As<T>(); }

    std::vector<T> pixels;
    std::unique_ptr<MemoryRasterDataConnection> connection;
    RasterReaderDispatchPtr dispatch;
};

void SetNoData(BasicRasterReader& reader, std::uint32_t band, double value) {
    RasterProps source;
    source.SetBands(reader.GetBands());
    source.SetNoDataValue(band, value);
    reader.SetNoDataValues(source);
}

TEST(ReaderRasterMemory, AnswersWithConstants) {
    Opened<short> raster;
    auto& reader = raster.Reader();
    EXPECT_EQ(reader.GetCapabilities(), 1u);
    EXPECT_EQ(reader.GetBaseReduction(), 0u);
    EXPECT_EQ(reader.GetLevelReduction(), 0u);
    EXPECT_EQ(reader.GetMinLevel(), 0);
    EXPECT_EQ(reader.GetMaxLevel(), 0);
    const std::int32_t pair[2] = {2, 2};
    EXPECT_FALSE(reader.HasPyramid());
    EXPECT_FALSE(reader.BuildPyramid(0, 1, 0, pair));
    EXPECT_FALSE(reader.CanBuildPyramid());
    EXPECT_FALSE(reader.DeletePyramid());
    EXPECT_FALSE(reader.RefreshPyramidState());
    EXPECT_EQ(reader.GetStatsMask(), 0u);
    EXPECT_FALSE(reader.CanStoreBandStats());
    EXPECT_FALSE(reader.CanStoreHistograms());
    EXPECT_FALSE(reader.SetBandStats({}));
    EXPECT_FALSE(reader.SetHistograms({}));
    EXPECT_FALSE(reader.GetPalette(0));
    EXPECT_FALSE(reader.SetPalette(0, Palette()));
    EXPECT_EQ(reader.GetConnection(), raster.connection.get());
}

TEST(ReaderRasterMemory, SizeIgnoresLevel) {
    Opened<int> raster;
    EXPECT_EQ(raster.Reader().GetSamples(3), 4u);
    EXPECT_EQ(raster.Reader().GetLines(-3), 3u);
}

TEST(ReaderRasterMemory, LevelsUpToZeroAreValid) {
    Opened<int> raster;
    EXPECT_TRUE(raster.Reader().IsValidLevel(0));
    EXPECT_FALSE(raster.Reader().IsValidLevel(1));
    EXPECT_TRUE(raster.Reader().IsValidLevel(-1));
}

TEST(ReaderRasterMemory, HigherLevelIsRefusedAndTouchesNothing) {
    Opened<int> raster;
    std::vector<int> tile(12, 77), list{0};
    std::vector<unsigned char> mask(12, 0xAB);
    const auto kept = raster.pixels;
    EXPECT_FALSE(raster.Reader().ReadTile(0, 0, 4, 3, ListView(list), 1, tile.data(), mask.data()));
    EXPECT_FALSE(
        raster.Reader().WriteTile(0, 0, 4, 3, ListView(list), 1, tile.data(), mask.data()));
    EXPECT_EQ(tile, std::vector<int>(12, 77));
    EXPECT_EQ(mask, std::vector<unsigned char>(12, 0xAB));
    EXPECT_EQ(raster.pixels, kept);
}

TEST(ReaderRasterMemory, NegativeLevelCountsAsZero) {
    Opened<int> raster;
    std::vector<int> tile(12), list{1};
    EXPECT_TRUE(raster.Reader().ReadTile(0, 0, 4, 3, ListView(list), -4, tile.data(), nullptr));
    EXPECT_TRUE(std::equal(tile.begin(), tile.end(), raster.pixels.begin() + 12));
}

TEST(ReaderRasterMemory, BandListOrdersThePlanesOfATile) {
    Opened<unsigned short> raster(Interleave::BSQ);
    std::vector<unsigned short> tile(24);
    std::vector<int> list{2, 0};
    ASSERT_TRUE(raster.Reader().ReadTile(0, 0, 4, 3, ListView(list), 0, tile.data(), nullptr));
    EXPECT_TRUE(std::equal(tile.begin(), tile.begin() + 12, raster.pixels.begin() + 24));
    EXPECT_TRUE(std::equal(tile.begin() + 12, tile.end(), raster.pixels.begin()));
}

TEST(ReaderRasterMemory, OneBandOfPixelInterleavedRaster) {
    Opened<float> raster(Interleave::BIP);
    std::vector<float> tile(12);
    std::vector<int> list{1};
    ASSERT_TRUE(raster.Reader().ReadTile(0, 0, 4, 3, ListView(list), 0, tile.data(), nullptr));
    for (std::size_t i = 0; i < 12; ++i) EXPECT_EQ(tile[i], raster.pixels[i * 3 + 1]);
}

TEST(ReaderRasterMemory, SinglePlaneIgnoresTheBandList) {
    Opened<unsigned char> raster(Interleave::None);
    std::vector<unsigned char> tile(12, 0), mask(36, 0xFF);
    std::vector<int> none, many{7, 8, 9};
    EXPECT_TRUE(raster.Reader().ReadTile(0, 0, 4, 3, ListView(none), 0, tile.data(), nullptr));
    EXPECT_TRUE(std::equal(tile.begin(), tile.end(), raster.pixels.begin()));
    tile.assign(12, 0);
    EXPECT_TRUE(raster.Reader().ReadTile(0, 0, 4, 3, ListView(many), 0, tile.data(), mask.data()));
    EXPECT_TRUE(std::equal(tile.begin(), tile.end(), raster.pixels.begin()));
    EXPECT_EQ(mask[11], 0xFE);
    EXPECT_EQ(mask[12], 0xFF) << "the mask has one plane, too";
}

TEST(ReaderRasterMemory, EmptyBandListCopiesNothing) {
    for (const std::int32_t interleave : {Interleave::BIP, Interleave::BIL, Interleave::BSQ}) {
        Opened<int> raster(interleave);
        std::vector<int> tile(12, 5), none;
        std::vector<unsigned char> mask(12, 0xFF);
        EXPECT_TRUE(
            raster.Reader().ReadTile(0, 0, 4, 3, ListView(none), 0, tile.data(), mask.data()));
        EXPECT_TRUE(
            raster.Reader().WriteTile(0, 0, 4, 3, ListView(none), 0, tile.data(), mask.data()));
        EXPECT_EQ(tile, std::vector<int>(12, 5));
        EXPECT_EQ(mask, std::vector<unsigned char>(12, 0xFF));
        EXPECT_EQ(raster.pixels, Samples<int>(36));
    }
}

TEST(ReaderRasterMemory, NoDataValueIsTruncatedAndCut) {
    Opened<unsigned char> raster;
    SetNoData(raster.Reader(), 1, 300.7);
    EXPECT_EQ(raster.Reader().GetNoDataValue(1), 44);
    Opened<std::uint64_t> wide;
    SetNoData(wide.Reader(), 0, 18446744073709549568.0);
    EXPECT_EQ(wide.Reader().GetNoDataValue(0), 18446744073709549568u);
}

TEST(ReaderRasterMemory, BandWithoutNoDataValueAnswersZero) {
    Opened<Complex<double>> raster;
    EXPECT_TRUE(raster.Reader().GetNoDataValue(0) == Complex<double>(0, 0));
    EXPECT_TRUE(raster.Reader().GetNoDataValue(4000000000u) == Complex<double>(0, 0));
    SetNoData(raster.Reader(), 0, -2.5);
    EXPECT_TRUE(raster.Reader().GetNoDataValue(0) == Complex<double>(-2.5, 0));
}

TEST(ReaderRasterMemory, StatisticsAndHistogramsAreDefaults) {
    Opened<double> raster;
    const auto stats = raster.Reader().GetBandStats(2);
    EXPECT_EQ(stats.band, 2u);
    EXPECT_EQ(stats.flags, 0u);
    EXPECT_EQ(stats.count, 0u);
    const auto histograms = raster.Reader().GetHistograms();
    EXPECT_EQ(histograms.shape.elements, 0u);
    EXPECT_TRUE(histograms.owned);
}

TEST(ReaderRasterMemory, WithoutConnectionItIsInvalidAndRefusesTiles) {
    RasterProps props;
    props.samples = props.lines = props.bands = 1;
    props.interleave = Interleave::BIP;
    props.pixelType = PixelTypeCode::Int32;
    ReaderRasterMemory<int> reader(nullptr, props);
    int tile = 5;
    unsigned char mask = 1;
    std::vector<int> list{0};
    EXPECT_FALSE(reader.IsValid());
    EXPECT_FALSE(reader.IsValidLevel(0));
    EXPECT_EQ(reader.GetConnection(), nullptr);
    EXPECT_FALSE(reader.ReadTile(0, 0, 1, 1, ListView(list), 0, &tile, &mask));
    EXPECT_FALSE(reader.WriteTile(0, 0, 1, 1, ListView(list), 0, &tile, &mask));
    EXPECT_EQ(tile, 5);
}

TEST(ReaderRasterMemory, ConnectionWithoutPixelsGivesAnInvalidReader) {
    MemoryRasterDataConnection connection;
    RasterProps props;
    props.interleave = Interleave::BIP;
    ReaderRasterMemory<int> reader(&connection, props);
    EXPECT_FALSE(reader.IsValid());
    EXPECT_EQ(reader.GetConnection(), &connection);
}

TEST(ReaderRasterMemory, UnknownInterleaveMovesNothingAndSucceeds) {
    Opened<int> raster;
    RasterProps props = raster.Reader().GetRasterProps();
    props.interleave = 7;
    ReaderRasterMemory<int> reader(raster.connection.get(), props);
    EXPECT_FALSE(reader.IsValid());
    std::vector<int> tile(12, 5), list{0};
    std::vector<unsigned char> mask(12, 1);
    EXPECT_TRUE(reader.ReadTile(0, 0, 4, 3, ListView(list), 0, tile.data(), mask.data()));
    EXPECT_TRUE(reader.WriteTile(0, 0, 4, 3, ListView(list), 0, tile.data(), mask.data()));
    EXPECT_EQ(tile, std::vector<int>(12, 5));
    EXPECT_EQ(mask, std::vector<unsigned char>(12, 1));
    EXPECT_EQ(raster.pixels, Samples<int>(36));
}

TEST(ReaderRasterMemory, ViewHasTheShapeOfTheInterleave) {
    Opened<char> raster;
    const auto extents = [&raster](std::int32_t interleave) {
        RasterProps props = raster.Reader().GetRasterProps();
        props.samples = 4;
        props.lines = 3;
        props.bands = 2;
        props.interleave = interleave;
        const ReaderRasterMemory<char> reader(raster.connection.get(), props);
        const ArrayShape& shape = reader.data.shape;
        return std::vector<std::uint32_t>(shape.extents, shape.extents + shape.dimensions);
    };
    using Extents = std::vector<std::uint32_t>;
    EXPECT_EQ(extents(Interleave::None), (Extents{3, 4}));
    EXPECT_EQ(extents(Interleave::BIP), (Extents{3, 4, 2}));
    EXPECT_EQ(extents(Interleave::BIL), (Extents{3, 2, 4}));
    EXPECT_EQ(extents(Interleave::BSQ), (Extents{2, 3, 4}));
}

TEST(ReaderRasterMemory, SizesOfZeroCountAsOne) {
    Opened<int> raster;
    RasterProps props = raster.Reader().GetRasterProps();
    props.samples = props.lines = props.bands = 0;
    ReaderRasterMemory<int> reader(raster.connection.get(), props);
    int tile = 0;
    std::vector<int> list{0};
    EXPECT_TRUE(reader.ReadTile(0, 0, 1, 1, ListView(list), 0, &tile, nullptr));
    EXPECT_EQ(tile, raster.pixels[0]);
}

TEST(ReaderRasterMemory, ReaderOutlivesItsConnection) {
    Opened<short> raster;
    raster.connection->Close();
    raster.connection.reset();
    std::vector<short> tile(12);
    std::vector<unsigned char> mask(12, 0);
    std::vector<int> list{1};
    EXPECT_TRUE(raster.Reader().ReadTile(0, 0, 4, 3, ListView(list), 0, tile.data(), mask.data()));
    EXPECT_TRUE(std::equal(tile.begin(), tile.end(), raster.pixels.begin() + 12));
    tile.assign(12, 9);
    EXPECT_TRUE(raster.Reader().WriteTile(0, 0, 4, 3, ListView(list), 0, tile.data(), mask.data()));
    EXPECT_EQ(raster.pixels[12], 9);
}

TEST(ReaderRasterMemory, BandNamedTwiceTakesTheLastValues) {
    for (const std::int32_t interleave : {Interleave::BIP, Interleave::BIL, Interleave::BSQ}) {
        Opened<int> raster(interleave);
        std::vector<int> list{1, 1};
        std::vector<int> tile{10, 20};
        std::vector<unsigned char> mask(2, 0);
        ASSERT_TRUE(
            raster.Reader().WriteTile(0, 0, 1, 1, ListView(list), 0, tile.data(), mask.data()));
        const Box box{4, 3, 3};
        EXPECT_EQ(raster.pixels[box.Index(interleave, 1, 0, 0)], 20);
    }
}

TEST(ReaderRasterMemory, ThousandsOfMillionsOfBandsCostNothing) {
    Opened<unsigned char> raster;
    RasterProps props = raster.Reader().GetRasterProps();
    props.bands = 4294967295u;
    ReaderRasterMemory<unsigned char> reader(raster.connection.get(), props);
    RasterProps source;
    source.SetBands(4294967295u);
    source.SetNoDataValue(4294967294u, 3);
    reader.SetNoDataValues(source);
    EXPECT_TRUE(reader.HasNoDataValue(4294967294u));
    EXPECT_FALSE(reader.HasNoDataValue(0));
}

#ifndef NDEBUG
TEST(ReaderRasterMemoryDeathTest, AssertionsNameTheCallersFaults) {
    Opened<int> raster;
    std::vector<int> tile(64), list{0}, beyond{3};
    const auto read = [&](int x, std::uint32_t width, std::vector<int>& bands, int* buffer) {
        raster.Reader().ReadTile(x, 0, width, 1, ListView(bands), 0, buffer, nullptr);
    };
    EXPECT_DEATH(read(2, 3, list, tile.data()), "within its raster");
    EXPECT_DEATH(read(-1, 2, list, tile.data()), "within its raster");
    EXPECT_DEATH(read(0, 1, beyond, tile.data()), "within its raster");
    EXPECT_DEATH(read(0, 1, list, nullptr), "needs its buffer");
}
#endif

}  // namespace
}  // namespace zmctest
