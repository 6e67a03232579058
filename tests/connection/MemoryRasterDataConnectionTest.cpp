#include "connection/MemoryRasterDataConnection.h"

#include <gtest/gtest.h>

#include <memory>
#include <stdexcept>
#include <vector>

#include "raster/ReaderRasterMemory.h"
#include "tests/support/ElementTypeList.h"
#include "tests/support/MemoryRaster.h"
#include "tests/support/TileModel.h"

namespace zmctest {

using namespace zelm;
namespace {

// Records the sizes that it is told; `throws` makes the next call on it, or on a clone, throw.
class SizedGeoRef final : public GeoRef {
public:
    static inline bool throws = false;
    std::vector<std::pair<std::uint32_t, std::uint32_t>> told;

    GeoRef* Clone() const override {
        if (throws) throw std::runtime_error("clone");
        return new SizedGeoRef(*this);
    }
    void SetRasterSize(std::uint32_t samples, std::uint32_t lines) override {
        told.emplace_back(samples, lines);
    }
};

class MemoryConnection : public ::testing::Test {
public:
    std::vector<unsigned char> pixels = Samples<unsigned char>(4096);
    MemoryRasterText text{pixels.data()};
    MemoryRasterDataConnection connection;

    bool Open(const std::string& source) {
        return connection.Open(Argument({source}), GeoRefPtr(), MetadataPtr());
    }
    bool Open() { return Open(text.Text()); }

    void ExpectClosed() {
        EXPECT_FALSE(connection.IsOpen());
        EXPECT_EQ(connection.pixelData, nullptr);
        EXPECT_FALSE(connection.rasterProps.IsValid());
        EXPECT_EQ(connection.GetPixelType(), 0u);
        EXPECT_EQ(connection.GetParameters().shape.elements, 0u);
    }
};

TEST_F(MemoryConnection, NewOneIsClosed) {
    EXPECT_TRUE(connection.initialised);
    EXPECT_FALSE(connection.reader);
    ExpectClosed();
    EXPECT_FALSE(connection.IsAvailable());
    EXPECT_FALSE(connection.IsReadable());
    EXPECT_FALSE(connection.ReservedConnectionQuery());
    EXPECT_TRUE(connection.GetConnectionString().IsEmpty());
}

TEST_F(MemoryConnection, AllNineKeysOpenIt) {
    ASSERT_TRUE(Open());
    EXPECT_TRUE(connection.IsOpen());
    EXPECT_TRUE(connection.IsAvailable());
    EXPECT_TRUE(connection.IsReadable());
    EXPECT_EQ(connection.GetPixelType(), 1u);
    EXPECT_EQ(connection.pixelData, pixels.data());
    EXPECT_TRUE(connection.name == "scene");
    const RasterProps props = connection.GetRasterProps();
    EXPECT_EQ(props.samples, 4u);
    EXPECT_EQ(props.lines, 3u);
    EXPECT_EQ(props.bands, 2u);
    EXPECT_EQ(props.interleave, Interleave::BSQ);
    EXPECT_TRUE(props.formatName == "MemoryRaster");
    EXPECT_EQ(props.tileSamples, 0u);
    EXPECT_TRUE(props.noDataValues.empty());
}

TEST_F(MemoryConnection, EveryKeyIsRequired) {
    for (const std::string key : {"SAMPLES", "LINES", "BANDS", "INTERLEAVE", "PIXELTYPE",
                                  "PIXELSIZE", "TIEPTMAP", "NAME", "PIXELDATA"}) {
        ASSERT_TRUE(Open());
        std::string dropped = text.Text();
        dropped.replace(dropped.find(key + "="), key.size(), "other");
        EXPECT_FALSE(Open(dropped)) << key;
        ExpectClosed();
    }
}

TEST_F(MemoryConnection, KeysMayStandInAnyOrder) {
    EXPECT_TRUE(Open("PIXELDATA=" + text.pixelData +
                     ";NAME=n;TIEPTMAP=0,0;PIXELSIZE=1,1;PIXELTYPE=1;INTERLEAVE=0;BANDS=1;"
                     "LINES=1;SAMPLES=1;"));
    EXPECT_TRUE(connection.IsOpen());
}

TEST_F(MemoryConnection, InterleaveHasFourCodes) {
    for (const char* code : {"3", "-2", "2147483648", "-99"}) {
        text.interleave = code;
        EXPECT_FALSE(Open()) << code;
        ExpectClosed();
    }
    for (const char* code : {"-1", "0", "1", "2", "x"}) {
        text.interleave = code;
        EXPECT_TRUE(Open()) << code;
    }
}

TEST_F(MemoryConnection, PixelTypeIsTheNumberOfAReader) {
    text.pixelType = "7";
    EXPECT_FALSE(Open());
    text.pixelType = "Byte";
    EXPECT_FALSE(Open());
    text.pixelType = "0x63";
    EXPECT_TRUE(Open());
    EXPECT_EQ(connection.GetPixelType(), 99u);
}

TEST_F(MemoryConnection, PairsMustBePairs) {
    for (const char* bad : {"1", "1,2,3", ","}) {
        text.pixelSize = bad;
        EXPECT_FALSE(Open()) << bad;
        text.pixelSize = "a,b";
        text.tiePoint = bad;
        EXPECT_FALSE(Open()) << bad;
        text.tiePoint = "0,0";
        EXPECT_TRUE(Open());
    }
}

TEST_F(MemoryConnection, NameIsTheFirstThatIsFound) {
    text.name = "";
    EXPECT_FALSE(Open());
    EXPECT_FALSE(Open("FILENAME=;" + text.Text()));
    EXPECT_TRUE(Open("FILENAME=x;" + text.Text()));
    EXPECT_TRUE(connection.name == "x");
}

TEST_F(MemoryConnection, FailedOpenMayLeaveANewName) {
    ASSERT_TRUE(Open());
    text.name = "other";
    text.pixelData = "";
    EXPECT_FALSE(Open());
    EXPECT_TRUE(connection.name == "other");
    ExpectClosed();
}

TEST_F(MemoryConnection, WithoutExactlyOneParameterNothingHappens) {
    ASSERT_TRUE(Open());
    EXPECT_FALSE(connection.Open(Argument({}), GeoRefPtr(), MetadataPtr()));
    EXPECT_FALSE(connection.Open(Argument({"a", "b"}), GeoRefPtr(), MetadataPtr()));
    EXPECT_TRUE(connection.IsOpen());
    EXPECT_EQ(connection.GetParameters().shape.elements, 2u);
}

TEST_F(MemoryConnection, AnEmptyParameterCloses) {
    ASSERT_TRUE(Open());
    EXPECT_FALSE(Open(""));
    ExpectClosed();
}

TEST_F(MemoryConnection, UnreadableAddressOpensWithoutPixels) {
    text.pixelData = "zz";
    EXPECT_TRUE(Open());
    EXPECT_FALSE(connection.IsOpen());
    EXPECT_EQ(connection.GetPixelType(), 0u);
    EXPECT_TRUE(connection.rasterProps.IsValid());
    EXPECT_EQ(connection.GetParameters().shape.elements, 2u);
    ASSERT_TRUE(connection.GetReader());
    EXPECT_EQ(connection.GetReader()->pixelType, 0u);
}

TEST_F(MemoryConnection, ConnectionStringSurvivesClose) {
    ASSERT_TRUE(Open());
    const std::string expected = "{MemoryRaster}@" + text.Text();
    EXPECT_EQ(connection.GetConnectionString().GetUtf8(), expected);
    connection.Close();
    EXPECT_EQ(connection.GetConnectionString().GetUtf8(), expected);
    EXPECT_TRUE(connection.name == "scene");
    ExpectClosed();
}

TEST_F(MemoryConnection, ParametersAreWordAndText) {
    ASSERT_TRUE(Open());
    const Array<String> parameters = connection.GetParameters();
    ASSERT_EQ(parameters.shape.elements, 2u);
    EXPECT_TRUE(parameters.data[0] == "MemoryRaster");
    EXPECT_TRUE(parameters.data[1] == text.Text().c_str());
}

TEST_F(MemoryConnection, ReaderBeforeOpenStaysInvalid) {
    const RasterReaderDispatchPtr early = connection.GetReader();
    ASSERT_TRUE(early);
    EXPECT_EQ(early->pixelType, 0u);
    ASSERT_TRUE(Open());
    EXPECT_EQ(connection.GetReader().Get(), early.Get());
}

TEST_F(MemoryConnection, PropsOfAnInvalidReaderCloseItInEffect) {
    EXPECT_EQ(connection.GetRasterProps().interleave, -1);
    EXPECT_TRUE(connection.GetRasterProps().formatName == "Unknown");
    ASSERT_TRUE(Open());
    EXPECT_FALSE(connection.GetRasterProps().IsValid());
    EXPECT_FALSE(connection.IsOpen());
}

TEST_F(MemoryConnection, ReaderIsBuiltOnce) {
    ASSERT_TRUE(Open());
    const RasterReaderDispatchPtr first = connection.GetReader();
    EXPECT_EQ(connection.GetReader().Get(), first.Get());
    connection.Close();
    EXPECT_EQ(connection.GetReader().Get(), first.Get());
    std::vector<unsigned char> other(4096, 9);
    MemoryRasterText second(other.data());
    ASSERT_TRUE(Open(second.Text()));
    EXPECT_EQ(connection.GetReader().Get(), first.Get()) << "still bound to the first buffer";
}

TEST_F(MemoryConnection, ReaderWorksOnAfterClose) {
    ASSERT_TRUE(Open());
    const RasterReaderDispatchPtr dispatch = connection.GetReader();
    connection.Close();
    unsigned char tile[12] = {};
    std::vector<int> list{1};
    EXPECT_TRUE(
        dispatch->As<unsigned char>()->ReadTile(0, 0, 4, 3, ListView(list), 0, tile, nullptr));
    EXPECT_TRUE(std::equal(tile, tile + 12, pixels.begin() + 12));
}

TEST_F(MemoryConnection, NoDataValuesOfTheReaderReachItWhenItAsks) {
    ASSERT_TRUE(Open());
    RasterProps source;
    source.SetBands(2);
    source.SetNoDataValue(1, 5);
    connection.GetReader()->As<unsigned char>()->SetNoDataValues(source);
    EXPECT_FALSE(connection.rasterProps.HasNoDataValue(1));
    EXPECT_TRUE(connection.GetRasterProps().HasNoDataValue(1));
    EXPECT_TRUE(connection.rasterProps.HasNoDataValue(1));
    ASSERT_TRUE(Open());
    EXPECT_FALSE(connection.rasterProps.HasNoDataValue(1)) << "every opening starts without";
}

TEST_F(MemoryConnection, CannotBeCreated) {
    ASSERT_TRUE(Open());
    EXPECT_FALSE(connection.Create(connection.GetParameters(), connection.GetRasterProps()));
}

TEST_F(MemoryConnection, GeoRefIsClonedAndToldTheSize) {
    auto* given = new SizedGeoRef;
    const GeoRefPtr geoRef(given);
    ASSERT_TRUE(connection.Open(Argument({text.Text()}), geoRef, MetadataPtr()));
    EXPECT_EQ(geoRef.record->count, 1u) << "the argument is let go";
    EXPECT_TRUE(given->told.empty());
    const auto* held = static_cast<SizedGeoRef*>(connection.rasterProps.geoRef.Get());
    ASSERT_NE(held, given);
    using Told = std::vector<std::pair<std::uint32_t, std::uint32_t>>;
    EXPECT_EQ(held->told, (Told{{4, 3}}));
}

TEST_F(MemoryConnection, SecondOpeningTellsTheFirstGeoRefEachChange) {
    // The reader keeps the clone of a clone alive for us to look at: the connection's own goes.
    ASSERT_TRUE(
        connection.Open(Argument({text.Text()}), GeoRefPtr(new SizedGeoRef), MetadataPtr()));
    const GeoRefPtr first = connection.rasterProps.geoRef;
    text.Size(8, 5, 2);
    ASSERT_TRUE(Open());
    using Told = std::vector<std::pair<std::uint32_t, std::uint32_t>>;
    EXPECT_EQ(static_cast<SizedGeoRef*>(first.Get())->told, (Told{{4, 3}, {8, 3}, {8, 5}}));
    EXPECT_FALSE(connection.rasterProps.geoRef);
}

TEST_F(MemoryConnection, GeoRefThatThrowsIsNotPassedOn) {
    const GeoRefPtr geoRef(new SizedGeoRef);
    ASSERT_TRUE(connection.Open(Argument({text.Text()}), geoRef, MetadataPtr()));
    SizedGeoRef::throws = true;
    EXPECT_NO_THROW(EXPECT_FALSE(connection.GetReader()));
    EXPECT_NO_THROW(EXPECT_FALSE(connection.GetRasterProps().IsValid()));
    EXPECT_TRUE(connection.IsOpen());
    EXPECT_NO_THROW(EXPECT_FALSE(connection.Open(Argument({text.Text()}), geoRef, MetadataPtr())));
    SizedGeoRef::throws = false;
    ExpectClosed();
}

TEST_F(MemoryConnection, ReaderWhoseGeoRefThrowsComputesNoMask) {
    const GeoRefPtr geoRef(new SizedGeoRef);
    ASSERT_TRUE(connection.Open(Argument({text.Text()}), geoRef, MetadataPtr()));
    const RasterReaderDispatchPtr dispatch = connection.GetReader();
    ASSERT_TRUE(dispatch);
    unsigned char tile[24] = {};
    std::vector<unsigned char> mask(24, 1);
    std::vector<int> list{0, 1};
    SizedGeoRef::throws = true;
    EXPECT_TRUE(
        dispatch->As<unsigned char>()->ReadTile(0, 0, 4, 3, ListView(list), 0, tile, mask.data()));
    SizedGeoRef::throws = false;
    EXPECT_EQ(mask, std::vector<unsigned char>(24, 1));
    EXPECT_TRUE(connection.GetRasterProps().IsValid());
}

TEST_F(MemoryConnection, SizesOfZeroAndSizesThatOverflow) {
    for (const char* size : {"0", "4294967295", "99999999999", "0xFFFFFFFF"}) {
        text.samples = text.lines = text.bands = size;
        for (const char* interleave : {"-1", "0", "1", "2"}) {
            text.interleave = interleave;
            MemoryRasterDataConnection fresh;
            ASSERT_TRUE(fresh.Open(Argument({text.Text()}), GeoRefPtr(), MetadataPtr()));
            EXPECT_TRUE(fresh.IsOpen());
            const RasterReaderDispatchPtr dispatch = fresh.GetReader();
            ASSERT_TRUE(dispatch);
            auto& reader = *dispatch->As<unsigned char>();
            unsigned char sample = 0, mask = 0;
            std::vector<int> list{0};
            EXPECT_TRUE(reader.ReadTile(0, 0, 1, 1, ListView(list), 0, &sample, &mask));
            EXPECT_EQ(sample, pixels[0]);
            reader.SetNoDataValues(fresh.GetRasterProps());
        }
    }
}

TEST_F(MemoryConnection, AMegabyteOfSeparators) {
    const std::string many(1 << 20, ';');
    EXPECT_FALSE(Open(many));
    EXPECT_TRUE(Open(many + text.Text() + many));
    EXPECT_TRUE(connection.IsOpen());
}

TEST(MemoryConnectionSelf, OwnsTheConnectionByARecordOfItsOwn) {
    auto* connection = new MemoryRasterDataConnection;
    const DataConnectionPtr self = connection->GetSelf();
    EXPECT_EQ(self.Get(), connection);
    EXPECT_EQ(self.record->count, 1u);
}

template <class T>
class TypedMemoryConnection : public ::testing::Test {};

TYPED_TEST_SUITE(TypedMemoryConnection, AllElementTypes, ElementTypeNames);

TYPED_TEST(TypedMemoryConnection, GivesTheReaderOfItsType) {
    using T = TypeParam;
    std::vector<T> pixels(24);
    MemoryRasterDataConnection connection;
    ASSERT_TRUE(connection.Open(
        Argument({MemoryRasterText(pixels.data()).Type(ElementTraits<T>::code).Text()}),
        GeoRefPtr(), MetadataPtr()));
    const RasterReaderDispatchPtr dispatch = connection.GetReader();
    ASSERT_TRUE(dispatch);
    EXPECT_EQ(dispatch->pixelType, ElementTraits<T>::code);
    EXPECT_EQ(dispatch->error.flags, 0u);
    ASSERT_TRUE(dispatch->template As<T>());
    EXPECT_EQ(dispatch->template As<T>()->GetConnection(), &connection);
}

}  // namespace
}  // namespace zmctest
