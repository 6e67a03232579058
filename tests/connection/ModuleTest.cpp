// The module as a host sees it: loaded by name, two functions, and everything else by the virtual
// operations of what they give.
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <thread>
#include <vector>

#include "connection/DataConnectionFactory.h"
#include "connection/RasterDataConnection.h"
#include "tests/support/ElementTypeList.h"
#include "tests/support/MemoryRaster.h"
#include "tests/support/TileModel.h"

namespace zmctest {

using namespace zelm;
namespace {

class Module : public ::testing::Test {
public:
    void SetUp() override {
        handle = dlopen(ZMC_MODULE_PATH, RTLD_NOW | RTLD_LOCAL);
        ASSERT_NE(handle, nullptr) << dlerror();
        create = reinterpret_cast<decltype(create)>(dlsym(handle, "CreateDataConnectionFactory"));
        destroy = reinterpret_cast<decltype(destroy)>(dlsym(handle, "DeleteDataConnectionFactory"));
        ASSERT_NE(create, nullptr);
        ASSERT_NE(destroy, nullptr);
        factory = create("MemoryRaster");
        ASSERT_NE(factory, nullptr);
    }

    void TearDown() override {
        if (destroy) destroy(factory);
        if (handle) {
            EXPECT_EQ(dlclose(handle), 0);
        }
    }

    RasterReaderDispatchPtr OpenReader(const std::string& text, DataConnectionPtr& connection) {
        connection = factory->Open(Argument({"MemoryRaster", text}), GeoRefPtr(), MetadataPtr());
        if (!connection) return RasterReaderDispatchPtr();
        return static_cast<RasterDataConnection*>(connection.Get())->GetReader();
    }

    void* handle = nullptr;
    DataConnectionFactory* (*create)(const String&) = nullptr;
    void (*destroy)(DataConnectionFactory*) = nullptr;
    DataConnectionFactory* factory = nullptr;
};

TEST_F(Module, ServesTwoKindsByTheirExactNames) {
    for (const char* kind : {"MemoryRaster", "Pyramid"}) {
        DataConnectionFactory* made = create(kind);
        EXPECT_NE(made, nullptr) << kind;
        destroy(made);
    }
    for (const char* kind : {"memoryraster", "", "PyramidRaster", "Pyramid "})
        EXPECT_EQ(create(kind), nullptr) << kind;
    EXPECT_EQ(create(String()), nullptr);
}

TEST_F(Module, DeletingNullDoesNothing) { destroy(nullptr); }

TEST_F(Module, FactoryServesBothKindsWhateverItsName) {
    EXPECT_TRUE(factory->IsRasterFactory());
    EXPECT_TRUE(factory->Test(Argument({"Pyramid", "a file"})));
    EXPECT_FALSE(factory->CreateDefault());
}

TEST_F(Module, ReadsWritesAndMasksARasterOfTheHost) {
    // Two bands of 16-bit samples, plane after plane.
    std::vector<unsigned short> pixels = Samples<unsigned short>(8 * 5 * 2);
    DataConnectionPtr connection;
    const RasterReaderDispatchPtr dispatch =
        OpenReader(MemoryRasterText(pixels.data()).Size(8, 5, 2).Type(PixelTypeCode::UInt16).Text(),
                   connection);
    ASSERT_TRUE(dispatch);
    auto* raster = static_cast<RasterDataConnection*>(connection.Get());
    EXPECT_EQ(raster->GetRasterProps().samples, 8u);

    RasterProps noData;
    noData.SetBands(2);
    noData.SetNoDataValue(0, pixels[40 + 9]);  // the tile's first band is the raster's second
    bool visited = dispatch->Visit([&noData](auto& reader) { reader.SetNoDataValues(noData); });
    EXPECT_TRUE(visited);

    std::vector<int> list{1, 0};
    std::vector<unsigned short> tile(2 * 3 * 2);
    std::vector<unsigned char> mask(tile.size(), 0x40);
    auto& reader = *dispatch->As<unsigned short>();
    ASSERT_TRUE(reader.ReadTile(1, 1, 3, 2, ListView(list), 0, tile.data(), mask.data()));
    const Box whole{8, 5, 2}, part{3, 2, 2};
    for (std::size_t k = 0; k < 2; ++k)
        for (std::size_t l = 0; l < 2; ++l)
            for (std::size_t s = 0; s < 3; ++s)
                EXPECT_EQ(tile[part.Index(Interleave::BSQ, k, l, s)],
                          pixels[whole.Index(Interleave::BSQ, 1 - k, l + 1, s + 1)]);
    EXPECT_EQ(mask[0], 0x41);
    EXPECT_EQ(mask[1], 0x40);

    tile.assign(tile.size(), 500);
    mask.assign(mask.size(), 0);
    ASSERT_TRUE(reader.WriteTile(0, 0, 3, 2, ListView(list), 0, tile.data(), mask.data()));
    EXPECT_EQ(pixels[0], 500);
    EXPECT_EQ(pixels[40 + 10], 500);
    EXPECT_TRUE(raster->GetRasterProps().HasNoDataValue(0));
}

TEST_F(Module, RunsEveryElementType){
#define ZMC_X(type, word, code)                                                                   \
    {                                                                                             \
        std::vector<type> pixels = Samples<type>(24), tile(24);                                   \
        DataConnectionPtr connection;                                                             \
        const RasterReaderDispatchPtr dispatch =                                                  \
            OpenReader(MemoryRasterText(pixels.data()).Type(code).Text(), connection);            \
        ASSERT_TRUE(dispatch) << #word;                                                           \
        ASSERT_EQ(dispatch->pixelType, static_cast<std::uint32_t>(code));                         \
        std::vector<int> list = AllBands(2);                                                      \
        EXPECT_TRUE(                                                                              \
            dispatch->As<type>()->ReadTile(0, 0, 4, 3, ListView(list), 0, tile.data(), nullptr)); \
        EXPECT_TRUE(SameBits(tile, pixels)) << #word;                                             \
    }
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
}

TEST_F(Module, ReaderOutlivesConnectionAndFactory) {
    std::vector<unsigned char> pixels = Samples<unsigned char>(24), tile(24);
    DataConnectionPtr connection;
    const RasterReaderDispatchPtr dispatch =
        OpenReader(MemoryRasterText(pixels.data()).Text(), connection);
    ASSERT_TRUE(dispatch);
    connection->Close();
    connection = DataConnectionPtr();
    destroy(factory);
    factory = nullptr;
    std::vector<unsigned char> mask(24, 0);
    std::vector<int> list = AllBands(2);
    EXPECT_TRUE(dispatch->As<unsigned char>()->ReadTile(0, 0, 4, 3, ListView(list), 0, tile.data(),
                                                        mask.data()));
    EXPECT_EQ(tile, pixels);
}

TEST_F(Module, ReadersOfOneRasterReadOnSeveralThreads) {
    constexpr std::size_t kSide = 128;
    std::vector<float> pixels = Samples<float>(kSide * kSide);
    std::vector<DataConnectionPtr> connections(4);
    std::vector<std::thread> threads;
    const std::string text =
        MemoryRasterText(pixels.data()).Size(kSide, kSide, 1).Type(PixelTypeCode::Single).Text();
    std::vector<int> failures(connections.size(), 0);
    for (std::size_t i = 0; i < connections.size(); ++i) {
        const RasterReaderDispatchPtr dispatch = OpenReader(text, connections[i]);
        ASSERT_TRUE(dispatch);
        threads.emplace_back([dispatch, &pixels, &failures, i] {
            std::vector<float> tile(pixels.size());
            std::vector<unsigned char> mask(pixels.size(), 0);
            std::vector<int> list{0};
            for (int round = 0; round < 20; ++round)
                if (!dispatch->As<float>()->ReadTile(0, 0, kSide, kSide, ListView(list), 0,
                                                     tile.data(), mask.data()) ||
                    !SameBits(tile, pixels))
                    ++failures[i];
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(failures, std::vector<int>(connections.size(), 0));
}

TEST_F(Module, CanBeLoadedAndUnloadedAgain) {
    for (int round = 0; round < 3; ++round) {
        void* again = dlopen(ZMC_MODULE_PATH, RTLD_NOW | RTLD_LOCAL);
        ASSERT_NE(again, nullptr);
        EXPECT_EQ(dlclose(again), 0);
    }
}

}  // namespace
}  // namespace zmctest
