#include "connection/RasterDataConnectionFactory.h"

#include <gtest/gtest.h>

#include <vector>

#include "connection/RasterDataConnection.h"
#include "tests/support/MemoryRaster.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {

using namespace zelm;
namespace {

class Factory : public ::testing::Test {
public:
    std::vector<unsigned char> pixels = std::vector<unsigned char>(64);
    MemoryRasterText text{pixels.data()};
    RasterDataConnectionFactory factory;

    DataConnectionPtr Open(std::initializer_list<std::string> elements,
                           MetadataPtr metadata = MetadataPtr()) {
        return factory.Open(Argument(elements), GeoRefPtr(), metadata);
    }
};

TEST_F(Factory, IsForRastersAndHasNoDefault) {
    EXPECT_TRUE(factory.IsRasterFactory());
    const DataConnectionPtr none = factory.CreateDefault();
    EXPECT_FALSE(none);
    EXPECT_NE(none.record, nullptr);
}

TEST_F(Factory, TestFoldsCaseThoughOpenDoesNot) {
    EXPECT_TRUE(factory.Test(Argument({"samples=1;lines=1;pixeldata=0"})));
    EXPECT_TRUE(factory.Test(Argument({"MemoryRaster", "samples=1;lines=1;pixeldata=0"})));
    EXPECT_FALSE(Open({"samples=1;lines=1;pixeldata=0"}));
}

TEST_F(Factory, TestTakesAnyOtherTextForAFileName) {
    EXPECT_TRUE(factory.Test(Argument({"SAMPLES=1;PIXELDATA=0"})));
    EXPECT_TRUE(factory.Test(Argument({"Pyramid", "no such file"})));
    EXPECT_FALSE(factory.Test(Argument({""})));
    EXPECT_FALSE(factory.Test(Argument({"Pyramid", ""})));
}

TEST_F(Factory, TestWantsOneParameter) {
    EXPECT_FALSE(factory.Test(Argument({})));
    EXPECT_FALSE(factory.Test(Argument({"a", "b"})));
    EXPECT_FALSE(factory.Test(Argument({"Pyramid"})));
    EXPECT_FALSE(factory.Test(Argument({"Pyramid", "a", "b"})));
    EXPECT_FALSE(factory.Test(Argument({"MemoryRaster"})));
    Array<String> null;
    null.Append(String());
    EXPECT_FALSE(factory.Test(null));
}

TEST_F(Factory, FormatWordDecidesTheTest) {
    EXPECT_FALSE(factory.Test(Argument({"MemoryRaster", "SAMPLES=1;PIXELDATA=0"})));
    EXPECT_TRUE(factory.Test(Argument({text.Text(), "MemoryRaster"})));
    EXPECT_TRUE(factory.Test(Argument({"Pyramid", text.Text()})));
}

TEST_F(Factory, OpensByFormatWord) {
    const DataConnectionPtr connection = Open({"MemoryRaster", text.Text()});
    ASSERT_TRUE(connection);
    EXPECT_TRUE(connection->IsOpen());
    EXPECT_EQ(connection.record->count, 1u);
}

TEST_F(Factory, OpensWithoutFormatWord) {
    const DataConnectionPtr connection = Open({text.Text()});
    ASSERT_TRUE(connection);
    EXPECT_TRUE(connection->GetParameters().data[0] == "MemoryRaster");
}

TEST_F(Factory, PyramidWordNeverOpensAMemoryRaster) {
    EXPECT_FALSE(Open({"Pyramid", text.Text()}));
}

TEST_F(Factory, IncompleteTextGivesAnEmptyPointer) {
    EXPECT_FALSE(Open({"MemoryRaster", "SAMPLES=1;LINES=1"}));
    EXPECT_FALSE(Open({}));
    EXPECT_FALSE(Open({"MemoryRaster"}));
    EXPECT_NE(Open({"MemoryRaster"}).record, nullptr);
}

TEST_F(Factory, HostsMetadataIsLetGoUnread) {
    const MetadataPtr metadata(new Metadata);
    const DataConnectionPtr connection = Open({text.Text()}, metadata);
    ASSERT_TRUE(connection);
    EXPECT_EQ(metadata.record->count, 1u);
    auto* raster = static_cast<RasterDataConnection*>(connection.Get());
    EXPECT_NE(raster->GetRasterProps().metadata.impl.Get(), metadata->impl.Get());
}

TEST_F(Factory, CannotCreateWhatIsNoPyramid) {
    RasterProps props;
    EXPECT_FALSE(factory.Create(Argument({"file"}), props));
    props.formatName = "MemoryRaster";
    EXPECT_FALSE(factory.Create(Argument({"MemoryRaster", text.Text()}), props));
}

TEST_F(Factory, ConnectionsOutliveIt) {
    DataConnectionPtr connection;
    {
        RasterDataConnectionFactory shortLived;
        connection = shortLived.Open(Argument({text.Text()}), GeoRefPtr(), MetadataPtr());
    }
    ASSERT_TRUE(connection);
    EXPECT_TRUE(connection->IsOpen());
}

}  // namespace
}  // namespace zmctest
