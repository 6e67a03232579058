// A host's view of pyramid files: the module is loaded, and nothing of it is used but its two
// functions and the interfaces that they lead to.
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cmath>
#include <vector>

#include "connection/DataConnectionFactory.h"
#include "connection/RasterDataConnection.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/ScratchDirectory.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {

using namespace zelm;
namespace {

class Module {
public:
    Module() : handle(dlopen(ZMC_MODULE_PATH, RTLD_NOW | RTLD_LOCAL)) {
        if (!handle) return;
        create = reinterpret_cast<decltype(create)>(dlsym(handle, "CreateDataConnectionFactory"));
        destroy = reinterpret_cast<decltype(destroy)>(dlsym(handle, "DeleteDataConnectionFactory"));
    }

    void* handle;  // stays loaded: objects of the module may outlive the test
    DataConnectionFactory* (*create)(const String&) = nullptr;
    void (*destroy)(DataConnectionFactory*) = nullptr;
};

class PyramidSystemTest : public ::testing::Test {
protected:
    void SetUp() override {
        static Module module;
        ASSERT_TRUE(module.handle) << dlerror();
        ASSERT_TRUE(module.create && module.destroy);
        factory = module.create("Pyramid");
        ASSERT_TRUE(factory);
        destroy = module.destroy;
    }
    void TearDown() override {
        if (destroy) destroy(factory);
    }

    static Array<String> Argument(const String& name) {
        Array<String> argument;
        argument.Append("Pyramid");
        argument.Append(name);
        return argument;
    }
    DataConnectionPtr Create(const String& name, const RasterProps& props) {
        return factory->Create(Argument(name), props);
    }
    DataConnectionPtr Open(const String& name) {
        return factory->Open(Argument(name), GeoRefPtr(), MetadataPtr());
    }
    static RasterReaderDispatchPtr Reader(const DataConnectionPtr& connection) {
        return static_cast<RasterDataConnection*>(connection.Get())->GetReader();
    }

    zmctest::ScratchDirectory folder;
    DataConnectionFactory* factory = nullptr;
    void (*destroy)(DataConnectionFactory*) = nullptr;
};

// A pixel that tells its place, band and level, within what every type holds.
template <class T>
T PixelAt(std::uint32_t x, std::uint32_t y, std::uint32_t band, std::int32_t level) {
    const std::uint32_t mixed =
        x * 7 + y * 13 + band * 29 + static_cast<std::uint32_t>(level) * 31 + x / 256 * 3;
    const auto value = static_cast<int>(mixed % 100 + 1);
    if constexpr (kIsComplex<T>) {
        using Part = decltype(T::re);
        return T(static_cast<Part>(value), static_cast<Part>(-value));
    } else {
        return static_cast<T>(value);
    }
}

template <class T>
void FillLevels(RasterReader<T>& reader, const RasterProps& props, std::int32_t maxLevel) {
    std::vector<int> all(props.bands);
    for (std::uint32_t b = 0; b < props.bands; ++b) all[b] = static_cast<int>(b);
    const Array<int> list(all.data(), ArrayShape(props.bands));
    for (std::int32_t level = 0; level <= maxLevel; ++level) {
        const std::uint32_t samples = props.samples >> level, lines = props.lines >> level;
        for (std::uint32_t y = 0; y < lines; y += 256) {
            for (std::uint32_t x = 0; x < samples; x += 256) {
                const std::uint32_t w = std::min(256u, samples - x), h = std::min(256u, lines - y);
                std::vector<T> tile;
                for (std::uint32_t r = 0; r < h; ++r)
                    for (std::uint32_t c = 0; c < w; ++c)
                        for (std::uint32_t b = 0; b < props.bands; ++b)
                            tile.push_back(PixelAt<T>(x + c, y + r, b, level));
                std::vector<unsigned char> mask(tile.size());
                ASSERT_TRUE(reader.WriteTile(static_cast<int>(x), static_cast<int>(y), w, h, list,
                                             level, tile.data(), mask.data()));
            }
        }
    }
}

template <class T>
void ExpectLevels(RasterReader<T>& reader, std::int32_t maxLevel) {
    ASSERT_EQ(reader.GetMaxLevel(), maxLevel);
    const std::uint32_t bands = reader.GetBands();
    int last[] = {static_cast<int>(bands) - 1, 0};
    const Array<int> list(last, ArrayShape(2));
    for (std::int32_t level = 0; level <= maxLevel; ++level) {
        const std::uint32_t w = reader.GetSamples(level), h = reader.GetLines(level);
        std::vector<T> pixels(std::size_t{w} * h * 2);
        ASSERT_TRUE(reader.ReadTile(0, 0, w, h, list, level, pixels.data(), nullptr));
        for (std::uint32_t y = 0; y < h; ++y)
            for (std::uint32_t x = 0; x < w; ++x)
                for (std::uint32_t i = 0; i < 2; ++i)
                    ASSERT_TRUE(pixels[(std::size_t{y} * w + x) * 2 + i] ==
                                PixelAt<T>(x, y, static_cast<std::uint32_t>(last[i]), level))
                        << level << ": " << x << ", " << y;
    }
}

TEST_F(PyramidSystemTest, EveryTypeAndOrderingThroughTheFactory) {
    ForEachElementType([this](auto type) {
        using T = typename decltype(type)::type;
        for (const auto& [bands, tileLines] : {std::pair{2u, 0u}, {3u, 256u}, {9u, 256u}}) {
            SCOPED_TRACE(std::string(ElementTraits<T>::word) + ", bands " + std::to_string(bands));
            const String name(((folder / ElementTraits<T>::word) + std::to_string(bands)).c_str());
            const RasterProps props =
                PyramidProps(300, 270, bands, ElementTraits<T>::code, tileLines);
            {
                const DataConnectionPtr connection = Create(name, props);
                ASSERT_TRUE(connection);
                const RasterReaderDispatchPtr dispatch = Reader(connection);
                RasterReader<T>& reader = *dispatch->template As<T>();
                const std::int32_t pair[] = {2, 2};
                ASSERT_TRUE(reader.BuildPyramid(0, 2, 0, pair));
                EXPECT_FALSE(reader.HasPyramid());
                ASSERT_NO_FATAL_FAILURE(FillLevels(reader, props, 2));
                EXPECT_TRUE(reader.RefreshPyramidState());
                EXPECT_TRUE(reader.HasPyramid());
                Array<RasterBandStats<T>> stats;
                stats.Append({});
                stats.data[0].flags = StatsFlag::Mean;
                stats.data[0].mean = 50.5;
                EXPECT_TRUE(reader.SetBandStats(stats));
            }
            const DataConnectionPtr connection = Open(name);
            ASSERT_TRUE(connection);
            EXPECT_EQ(connection->GetPixelType(), ElementTraits<T>::code);
            const RasterReaderDispatchPtr dispatch = Reader(connection);
            RasterReader<T>& reader = *dispatch->template As<T>();
            EXPECT_TRUE(reader.HasPyramid());
            ASSERT_NO_FATAL_FAILURE(ExpectLevels(reader, 2));
            EXPECT_EQ(reader.GetBandStats(0).mean, 50.5);
            EXPECT_TRUE(reader.DeletePyramid());
        }
    });
}

TEST_F(PyramidSystemTest, NamesOutsideAscii) {
    for (const char* leaf : {"b\xC3\xA4nder.pyr", "\xE5\x9C\xB0\xE5\x9B\xB3",
                             "\xF0\x9F\x97\xBA.pyr", "with space; and = signs"}) {
        const String name((folder / leaf).c_str());
        {
            const DataConnectionPtr connection = Create(name, PyramidProps(5, 4, 1, 1));
            ASSERT_TRUE(connection);
            const std::int32_t pair[] = {2, 2};
            const RasterReaderDispatchPtr dispatch = Reader(connection);
            ASSERT_TRUE(dispatch->readerByte->BuildPyramid(0, 0, 0, pair));
        }
        EXPECT_TRUE(std::filesystem::exists((folder / leaf))) << leaf;
        const DataConnectionPtr connection = Open(name);
        ASSERT_TRUE(connection) << leaf;
        EXPECT_TRUE(connection->GetParameters().data[1] == name);
        EXPECT_TRUE(connection->GetConnectionString() == String("{PyramidRaster}@") + name);
        const RasterReaderDispatchPtr dispatch = Reader(connection);
        EXPECT_TRUE(dispatch->readerByte->DeletePyramid());
        EXPECT_FALSE(std::filesystem::exists((folder / leaf))) << leaf;
    }
}

TEST_F(PyramidSystemTest, RecordsAndMasksThroughTheDispatch) {
    const String name((folder / "records").c_str());
    const DataConnectionPtr connection = Create(name, PyramidProps(4, 1, 1, PixelTypeCode::Single));
    const RasterReaderDispatchPtr dispatch = Reader(connection);
    bool visited = false;
    dispatch->Visit([&](auto& reader) {
        const std::int32_t pair[] = {1, 1};
        visited = reader.BuildPyramid(0, 0, 0, pair);
    });
    EXPECT_TRUE(visited);
    RasterReader<float>& reader = *dispatch->readerSingle;
    RasterProps source;
    source.SetBands(1);
    source.SetNoDataValue(0, -9999);
    reader.SetNoDataValues(source);
    int band = 0;
    const Array<int> list(&band, ArrayShape(1));
    float pixels[] = {1, 2, NAN, 4};
    unsigned char mask[] = {0, 1, 0, 0};
    EXPECT_TRUE(reader.WriteTile(0, 0, 4, 1, list, 0, pixels, mask));
    EXPECT_EQ(pixels[1], -9999);
    float read[4] = {};
    EXPECT_TRUE(reader.ReadTile(0, 0, 4, 1, list, 0, read, mask));
    EXPECT_EQ(mask[0], 0);
    EXPECT_EQ(mask[1], 1);
    EXPECT_EQ(mask[2], 1);
    EXPECT_EQ(mask[3], 0);
    Palette palette;
    unsigned char channels[4] = {255, 128, 0, 255};
    palette.AddColor(RGBAColor(Array<unsigned char>(channels, ArrayShape(4))));
    EXPECT_TRUE(reader.SetPalette(0, palette));
    EXPECT_TRUE(reader.HasPalette(0));
    EXPECT_EQ(reader.GetPalette(0)->GetColor(0)->green, 128);
}

TEST_F(PyramidSystemTest, FactoryMayGoBeforeItsConnections) {
    zmctest::WriteText((folder / "file"), HeaderText().File());
    const DataConnectionPtr connection = Open((folder / "file").c_str());
    ASSERT_TRUE(connection);
    destroy(factory);
    factory = nullptr;
    unsigned char pixel = 0;
    EXPECT_TRUE(Reader(connection)->readerByte->ReadTile(0, 0, 1, 1, {}, 0, &pixel, nullptr));
    EXPECT_EQ(pixel, 1);
}

TEST_F(PyramidSystemTest, FileBeyondFourGigabytes) {
    const String name((folder / "large").c_str());
    const DataConnectionPtr connection = Create(name, PyramidProps(70000, 70000, 1, 1));
    const RasterReaderDispatchPtr dispatch = Reader(connection);
    RasterReader<unsigned char>& reader = *dispatch->readerByte;
    const std::int32_t pair[] = {2, 2};
    ASSERT_TRUE(reader.BuildPyramid(0, 1, 0, pair));
    std::vector<unsigned char> first(256 * 256, 1), last(112 * 112, 2), mask(256 * 256);
    int band = 0;
    const Array<int> list(&band, ArrayShape(1));
    EXPECT_TRUE(reader.WriteTile(0, 0, 256, 256, list, 0, first.data(), mask.data()));
    EXPECT_TRUE(reader.WriteTile(69888, 69888, 112, 112, list, 0, last.data(), mask.data()));
    EXPECT_TRUE(reader.RefreshPyramidState());
    EXPECT_TRUE(reader.HasPyramid());
    EXPECT_GT(std::filesystem::file_size((folder / "large")), std::uint64_t{4} << 30);
    const DataConnectionPtr again = Open(name);
    const RasterReaderDispatchPtr second = Reader(again);
    unsigned char pixel = 0;
    EXPECT_TRUE(second->readerByte->ReadTile(255, 255, 1, 1, list, 0, &pixel, nullptr));
    EXPECT_EQ(pixel, 1);
    EXPECT_TRUE(second->readerByte->ReadTile(69999, 69999, 1, 1, list, 0, &pixel, nullptr));
    EXPECT_EQ(pixel, 2);
    EXPECT_TRUE(second->readerByte->ReadTile(35000, 35000, 1, 1, list, 0, &pixel, nullptr));
    EXPECT_EQ(pixel, 0);
}

}  // namespace
}  // namespace zmctest
