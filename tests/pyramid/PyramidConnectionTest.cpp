#include "pyramid/PyramidDataConnection.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <vector>

#include "connection/RasterDataConnectionFactory.h"
#include "pyramid/PyramidRasterReader.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/ScratchDirectory.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {

using namespace zelm;
namespace {

Array<String> ArrayOf(std::initializer_list<std::string> texts) {
    Array<String> array;
    for (const std::string& text : texts) array.Append(text.c_str());
    return array;
}

// Records the sizes that it is told, in a list that its clones share.
class RecordingGeoRef : public GeoRef {
public:
    using Sizes = std::vector<std::pair<std::uint32_t, std::uint32_t>>;
    explicit RecordingGeoRef(std::shared_ptr<Sizes> told) : sizes(std::move(told)) {}
    GeoRef* Clone() const override { return new RecordingGeoRef(sizes); }
    void SetRasterSize(std::uint32_t samples, std::uint32_t lines) override {
        sizes->emplace_back(samples, lines);
    }
    std::shared_ptr<Sizes> sizes;
};

class PyramidConnectionTest : public ::testing::Test {
protected:
    PyramidConnectionTest() { zmctest::WriteText(name, HeaderText().File()); }

    bool Open(PyramidDataConnection& closed, GeoRefPtr geoRef = GeoRefPtr(),
              MetadataPtr metadata = MetadataPtr()) {
        return closed.Open(ArrayOf({name}), geoRef, metadata);
    }

    zmctest::ScratchDirectory folder;
    std::string name = (folder / "connection.pyr");
    PyramidDataConnection connection;
};

TEST_F(PyramidConnectionTest, FreshConnection) {
    EXPECT_FALSE(connection.IsOpen());
    EXPECT_FALSE(connection.IsAvailable());
    EXPECT_FALSE(connection.IsReadable());
    EXPECT_FALSE(connection.reader) << "asking a closed connection builds nothing";
    EXPECT_EQ(connection.GetPixelType(), 0u);
    EXPECT_EQ(connection.GetParameters().shape.elements, 0u);
    EXPECT_TRUE(connection.GetConnectionString().IsEmpty());
    EXPECT_FALSE(connection.ReservedConnectionQuery());
}

TEST_F(PyramidConnectionTest, OpenFile) {
    ASSERT_TRUE(Open(connection));
    EXPECT_TRUE(connection.IsOpen());
    EXPECT_TRUE(connection.IsAvailable());
    EXPECT_EQ(connection.GetPixelType(), 1u);
    const Array<String> parameters = connection.GetParameters();
    ASSERT_EQ(parameters.shape.elements, 2u);
    EXPECT_TRUE(parameters.data[0] == "Pyramid");
    EXPECT_TRUE(parameters.data[1] == name.c_str());
    EXPECT_TRUE(connection.GetConnectionString() == ("{PyramidRaster}@" + name).c_str());
    const RasterProps props = connection.GetRasterProps();
    EXPECT_EQ(props.samples, 10u);
    EXPECT_EQ(props.lines, 6u);
    EXPECT_TRUE(connection.GetReader()->As<unsigned char>()->HasPyramid());
}

TEST_F(PyramidConnectionTest, WrongNumberOfParametersTouchesNothing) {
    ASSERT_TRUE(Open(connection));
    const auto* dataset = connection.dataset.Get();
    EXPECT_FALSE(connection.Open(ArrayOf({name, name}), GeoRefPtr(), MetadataPtr()));
    EXPECT_FALSE(connection.Open({}, GeoRefPtr(), MetadataPtr()));
    EXPECT_EQ(connection.dataset.Get(), dataset);
    EXPECT_EQ(connection.GetParameters().shape.elements, 2u);
}

TEST_F(PyramidConnectionTest, EmptyNameCloses) {
    ASSERT_TRUE(Open(connection));
    EXPECT_FALSE(connection.Open(ArrayOf({""}), GeoRefPtr(), MetadataPtr()));
    EXPECT_FALSE(connection.IsOpen());
    EXPECT_EQ(connection.GetParameters().shape.elements, 0u);
    Array<String> null;
    null.Append(String());
    EXPECT_FALSE(connection.Open(null, GeoRefPtr(), MetadataPtr()));
}

TEST_F(PyramidConnectionTest, FilesThatDoNotOpen) {
    const std::string other = (folder / "other");
    zmctest::WriteText(other, "not a pyramid at all, though long enough to be one");
    zmctest::WriteText((folder / "empty"), "");
    zmctest::WriteText((folder / "short"), "KOBT\x15");
    for (const std::string& bad :
         {(folder / "missing"), folder.String(), other, (folder / "empty"), (folder / "short"),
          std::string("/dev/null"), " " + name, name + " "}) {
        ASSERT_TRUE(Open(connection));
        const String before = connection.GetConnectionString();
        EXPECT_FALSE(connection.Open(ArrayOf({bad}), GeoRefPtr(), MetadataPtr())) << bad;
        EXPECT_FALSE(connection.IsOpen());
        EXPECT_EQ(connection.GetParameters().shape.elements, 0u);
        EXPECT_TRUE(connection.GetConnectionString() == before);
    }
}

TEST_F(PyramidConnectionTest, HeadersThatDoNotOpen) {
    HeaderText zeroTile, levels, huge;
    zeroTile.tileSize = 0;
    levels.levelMax = 1024;
    huge.ordering = "Morton";
    huge.width = huge.height = huge.bands = 4000000000u;
    for (const HeaderText& header : {zeroTile, levels, huge}) {
        zmctest::WriteText(name, FileWithHeader(header.Text()));
        EXPECT_FALSE(Open(connection));
    }
}

TEST_F(PyramidConnectionTest, CloseKeepsWhatIsTold) {
    const auto sizes = std::make_shared<RecordingGeoRef::Sizes>();
    const MetadataPtr metadata(new Metadata);
    ASSERT_TRUE(Open(connection, GeoRefPtr(new RecordingGeoRef(sizes)), metadata));
    const auto* dispatch = connection.GetReader().Get();
    connection.Close();
    EXPECT_FALSE(connection.IsOpen());
    EXPECT_FALSE(connection.geoRef);
    EXPECT_EQ(connection.metadata.Get(), metadata.Get());
    EXPECT_EQ(connection.GetParameters().shape.elements, 0u);
    EXPECT_TRUE(connection.GetConnectionString() == ("{PyramidRaster}@" + name).c_str());
    EXPECT_EQ(connection.GetReader().Get(), dispatch) << "the reader stays, with the old dataset";
    EXPECT_EQ(connection.GetPixelType(), 0u);
    ASSERT_TRUE(Open(connection));
    EXPECT_EQ(connection.GetReader().Get(), dispatch);
    const auto* reader = static_cast<const PyramidRasterReader<unsigned char>*>(
        connection.GetReader()->As<unsigned char>().Get());
    ASSERT_TRUE(reader);
    EXPECT_NE(reader->dataset.Get(), connection.dataset.Get());
}

TEST_F(PyramidConnectionTest, FailedOpenKeepsTheMetadata) {
    const MetadataPtr metadata(new Metadata);
    EXPECT_FALSE(connection.Open(ArrayOf({(folder / "missing")}), GeoRefPtr(), metadata));
    EXPECT_EQ(connection.metadata.Get(), metadata.Get());
}

TEST_F(PyramidConnectionTest, IsReadableIsFalseAndBuildsTheReader) {
    ASSERT_TRUE(Open(connection));
    EXPECT_FALSE(connection.IsReadable());
    ASSERT_TRUE(connection.reader);
    EXPECT_EQ(connection.GetReader().Get(), connection.reader.Get());
}

TEST_F(PyramidConnectionTest, ReaderAskedForTooSoonStaysUnbound) {
    const RasterProps props = connection.GetRasterProps();
    EXPECT_TRUE(props.formatName == "Unknown");
    EXPECT_EQ(props.samples, 0u);
    ASSERT_TRUE(connection.reader);
    EXPECT_EQ(connection.reader->pixelType, 0u);
    ASSERT_TRUE(Open(connection));
    EXPECT_EQ(connection.GetReader()->pixelType, 0u);
}

TEST_F(PyramidConnectionTest, ReaderOfEachPixelType) {
    ForEachElementType([this](auto type) {
        using T = typename decltype(type)::type;
        HeaderText header;
        header.pixelType = ElementTraits<T>::word;
        zmctest::WriteText(name, header.File());
        PyramidDataConnection one;
        ASSERT_TRUE(Open(one));
        EXPECT_EQ(one.GetPixelType(), ElementTraits<T>::code);
        EXPECT_EQ(one.GetReader()->pixelType, ElementTraits<T>::code);
        EXPECT_TRUE(one.GetReader()->template As<T>());
    });
}

TEST_F(PyramidConnectionTest, PixelTypesWithoutAReader) {
    for (const char* word : {"Bool", "Quad", "nonsense"}) {
        HeaderText header;
        header.pixelType = word;
        zmctest::WriteText(name, header.File());
        PyramidDataConnection one;
        ASSERT_TRUE(Open(one)) << word;
        EXPECT_EQ(one.GetReader()->pixelType, 0u);
        EXPECT_EQ(one.GetRasterProps().samples, 0u);
    }
}

TEST_F(PyramidConnectionTest, GeoReferenceIsClonedAndToldTheSize) {
    const auto sizes = std::make_shared<RecordingGeoRef::Sizes>();
    const GeoRefPtr geoRef(new RecordingGeoRef(sizes));
    ASSERT_TRUE(Open(connection, geoRef));
    EXPECT_EQ(connection.geoRef.Get(), geoRef.Get());
    EXPECT_TRUE(sizes->empty());
    const RasterReaderDispatchPtr dispatch = connection.GetReader();
    EXPECT_EQ(*sizes, (RecordingGeoRef::Sizes{{0, 0}, {10, 0}, {10, 6}}));
    const RasterProps props = dispatch->GetRasterProps();
    EXPECT_TRUE(props.geoRef);
    EXPECT_NE(props.geoRef.Get(), geoRef.Get());
}

TEST_F(PyramidConnectionTest, MetadataTreeIsShared) {
    const MetadataPtr metadata(new Metadata);
    ASSERT_TRUE(Open(connection, GeoRefPtr(), metadata));
    EXPECT_EQ(connection.GetRasterProps().metadata.impl.Get(), metadata->impl.Get());
    PyramidDataConnection without;
    ASSERT_TRUE(Open(without));
    EXPECT_TRUE(without.GetRasterProps().metadata.impl);
}

TEST_F(PyramidConnectionTest, CreateMakesNoFile) {
    const std::string fresh = (folder / "fresh.pyr");
    ASSERT_TRUE(connection.Create(ArrayOf({fresh, "b", "c"}), PyramidProps(300, 200, 1, 2)));
    EXPECT_EQ(connection.GetParameters().shape.elements, 2u);
    EXPECT_TRUE(connection.GetConnectionString() == ("{PyramidRaster}@" + fresh).c_str());
    EXPECT_TRUE(connection.IsOpen());
    EXPECT_EQ(connection.GetPixelType(), 2u);
    EXPECT_FALSE(std::filesystem::exists(fresh));
    const std::int32_t pair[] = {2, 2};
    EXPECT_TRUE(connection.GetReader()->As<short>()->BuildPyramid(0, 1, 0, pair));
    EXPECT_TRUE(std::filesystem::exists(fresh));
}

TEST_F(PyramidConnectionTest, CreateRefusals) {
    RasterProps props = PyramidProps(1, 1, 1, 1);
    EXPECT_FALSE(connection.Create({}, props));
    EXPECT_FALSE(connection.Create(ArrayOf({""}), props));
    Array<String> null;
    null.Append(String());
    EXPECT_FALSE(connection.Create(null, props));
    props.formatName = "Unknown";
    EXPECT_FALSE(connection.Create(ArrayOf({name}), props));
    ASSERT_TRUE(Open(connection));
    EXPECT_FALSE(connection.Create(ArrayOf({name}), props));
    EXPECT_TRUE(connection.IsOpen()) << "these failures close nothing";
    props.formatName = "MemoryRaster";
    EXPECT_TRUE(connection.Create(ArrayOf({name}), props)) << "any format of the table will do";
}

TEST_F(PyramidConnectionTest, CreateChoosesTheOrdering) {
    const auto orderingOf = [&](std::uint32_t bands, std::uint32_t tileLines) {
        PyramidDataConnection one;
        EXPECT_TRUE(one.Create(ArrayOf({name}), PyramidProps(9, 9, bands, 1, tileLines)));
        return one.dataset->TileOrdering;
    };
    EXPECT_EQ(orderingOf(8, 0), 0u);
    EXPECT_EQ(orderingOf(8, 1), 0u);
    EXPECT_EQ(orderingOf(8, 2), 1u);
    EXPECT_EQ(orderingOf(9, 0), 2u);
    EXPECT_EQ(orderingOf(9, 256), 2u);
}

TEST_F(PyramidConnectionTest, NewFileTakesNeitherGeoReferenceNorMetadataOfItsProperties) {
    const auto sizes = std::make_shared<RecordingGeoRef::Sizes>();
    RasterProps props = PyramidProps(9, 9, 1, 1);
    props.geoRef = GeoRefPtr(new RecordingGeoRef(sizes));
    ASSERT_TRUE(connection.Create(ArrayOf({(folder / "fresh")}), props));
    EXPECT_FALSE(connection.geoRef);
    EXPECT_FALSE(connection.GetRasterProps().geoRef);
}

// --- the factory's steps ---

TEST_F(PyramidConnectionTest, FactoryOpensByWordAndWithout) {
    RasterDataConnectionFactory factory;
    for (const auto& argument :
         {ArrayOf({"Pyramid", name}), ArrayOf({name, "Pyramid"}), ArrayOf({name})}) {
        const DataConnectionPtr opened =
            factory.Open(argument, GeoRefPtr(), MetadataPtr(new Metadata));
        ASSERT_TRUE(opened);
        EXPECT_TRUE(opened->GetParameters().data[0] == "Pyramid");
        EXPECT_FALSE(dynamic_cast<PyramidDataConnection&>(*opened).metadata)
            << "the host's metadata stays outside";
    }
    EXPECT_FALSE(factory.Open(ArrayOf({"MemoryRaster", name}), GeoRefPtr(), MetadataPtr()));
    EXPECT_FALSE(factory.Open(ArrayOf({"Pyramid", (folder / "no")}), GeoRefPtr(), MetadataPtr()));
    EXPECT_FALSE(factory.Open(ArrayOf({(folder / "no")}), GeoRefPtr(), MetadataPtr()));
    EXPECT_FALSE(factory.Open({}, GeoRefPtr(), MetadataPtr()));
}

TEST_F(PyramidConnectionTest, FactoryWithTheWordPyramidTriesNoMemoryRaster) {
    unsigned char pixel = 0;
    char address[32];
    std::snprintf(address, sizeof address, "%p", static_cast<void*>(&pixel));
    const std::string memory =
        std::string(
            "SAMPLES=1;LINES=1;BANDS=1;INTERLEAVE=0;PIXELTYPE=1;PIXELSIZE=1,1;TIEPTMAP=0,0;NAME=n;"
            "PIXELDATA=") +
        address;
    RasterDataConnectionFactory factory;
    EXPECT_TRUE(factory.Open(ArrayOf({memory}), GeoRefPtr(), MetadataPtr()));
    EXPECT_FALSE(factory.Open(ArrayOf({"Pyramid", memory}), GeoRefPtr(), MetadataPtr()));
}

TEST_F(PyramidConnectionTest, FactoryCreatesPyramidsAlone) {
    RasterDataConnectionFactory factory;
    RasterProps props = PyramidProps(9, 9, 1, 1);
    const DataConnectionPtr made = factory.Create(ArrayOf({"MemoryRaster", name}), props);
    ASSERT_TRUE(made) << "the word of the argument is not consulted";
    EXPECT_TRUE(made->GetParameters().data[1] == name.c_str());
    EXPECT_FALSE(factory.Create(ArrayOf({"Pyramid"}), props));
    for (const char* format : {"Unknown", "MemoryRaster", "pyramid"}) {
        props.formatName = format;
        EXPECT_FALSE(factory.Create(ArrayOf({name}), props)) << format;
    }
}

}  // namespace
}  // namespace zmctest
