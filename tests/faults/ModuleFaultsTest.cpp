// Every public call of the loaded module with each allocation failing in turn: the answer is either
// the right one or the neutral one, nothing is thrown, and nothing leaks.
#include <dlfcn.h>

#include <array>
#include <cstdint>
#include <cstdio>
#include <string>

#include "connection/DataConnectionFactory.h"
#include "connection/RasterDataConnection.h"
#include "core/PixelVocabulary.h"
#include "tests/support/AllocationFaults.h"
#include "tests/support/CountingGeoRef.h"

namespace zelm {
namespace {

using zmctest::AllocationFaults;
using zmctest::CountingGeoRef;
using zmctest::ForEachAllocationFailing;

constexpr std::uint32_t kSamples = 4;
constexpr std::uint32_t kLines = 3;

class ModuleFaults : public ::testing::Test {
protected:
    ModuleFaults() {
        void* const module = dlopen(ZMC_MODULE_PATH, RTLD_NOW | RTLD_LOCAL);
        if (!module) return;
        create = reinterpret_cast<decltype(create)>(dlsym(module, "CreateDataConnectionFactory"));
        destroy = reinterpret_cast<decltype(destroy)>(dlsym(module, "DeleteDataConnectionFactory"));
        if (create) factory = create("MemoryRaster");
        for (std::size_t i = 0; i < pixels.size(); ++i) pixels[i] = static_cast<float>(i);
        char address[24];
        std::snprintf(address, sizeof address, "%p", static_cast<void*>(pixels.data()));
        argument.Append("MemoryRaster");
        argument.Append(("SAMPLES=4;LINES=3;BANDS=2;INTERLEAVE=2;PIXELTYPE=4;PIXELSIZE=1,1;"
                         "TIEPTMAP=0,0;NAME=faults;PIXELDATA=" +
                         std::string(address))
                            .c_str());
    }

    void SetUp() override { ASSERT_NE(factory, nullptr) << dlerror(); }

    ~ModuleFaults() override {
        if (factory) destroy(factory);
    }

    DataConnectionPtr Open() { return factory->Open(argument, geoRef, MetadataPtr()); }
    static RasterDataConnection& Raster(const DataConnectionPtr& connection) {
        return static_cast<RasterDataConnection&>(*connection);
    }

    // What a connection says that has opened whatever memory it lacked meanwhile.
    void ExpectWhole(const DataConnectionPtr& connection) const {
        ASSERT_TRUE(connection->IsOpen());
        EXPECT_EQ(connection->GetPixelType(), 4u);
        EXPECT_TRUE(connection->GetConnectionString() ==
                    String("{MemoryRaster}@") + argument.data[1]);
        const Array<String> parameters = connection->GetParameters();
        ASSERT_EQ(parameters.shape.elements, 2u);
        EXPECT_TRUE(parameters.data[0] == argument.data[0]);
        EXPECT_TRUE(parameters.data[1] == argument.data[1]);
        const RasterReaderDispatchPtr reader = Raster(connection).GetReader();
        ASSERT_TRUE(reader);
        EXPECT_TRUE(reader->As<float>());
        const RasterProps props = Raster(connection).GetRasterProps();
        EXPECT_EQ(props.samples, kSamples);
        EXPECT_EQ(props.lines, kLines);
        EXPECT_EQ(props.bands, 2u);
        EXPECT_EQ(props.interleave, Interleave::BSQ);
        EXPECT_TRUE(props.formatName == "MemoryRaster");
    }

    decltype(&CreateDataConnectionFactory) create = nullptr;
    decltype(&DeleteDataConnectionFactory) destroy = nullptr;
    DataConnectionFactory* factory = nullptr;
    std::array<float, kSamples * kLines * 2> pixels{};
    Array<String> argument;
    GeoRefPtr geoRef{new CountingGeoRef};
};

TEST_F(ModuleFaults, FactoryIsMadeOrNull) {
    const String kind("Pyramid");
    const std::size_t points = ForEachAllocationFailing([&](AllocationFaults& faults) {
        DataConnectionFactory* const made = create(kind);
        const bool failed = faults.Failed() != 0;
        faults.Disarm();
        EXPECT_TRUE(made != nullptr || failed);
        destroy(made);
    });
    EXPECT_GE(points, 1u);
}

TEST_F(ModuleFaults, FactoryAnswers) {
    ForEachAllocationFailing([&](AllocationFaults& faults) {
        const bool raster = factory->IsRasterFactory();
        const bool tested = factory->Test(argument);
        const DataConnectionPtr none = factory->CreateDefault();
        const DataConnectionPtr created = factory->Create(argument, RasterProps());
        const bool failed = faults.Failed() != 0;
        faults.Disarm();
        EXPECT_TRUE(raster);
        EXPECT_TRUE(tested || failed);
        EXPECT_FALSE(none);
        EXPECT_FALSE(created);
    });
}

TEST_F(ModuleFaults, OpenGivesAnEmptyPointerOrAWholeConnection) {
    const std::size_t points = ForEachAllocationFailing([&](AllocationFaults& faults) {
        DataConnectionPtr connection = Open();
        const bool failed = faults.Failed() != 0;
        faults.Disarm();
        EXPECT_TRUE(connection || failed);
        if (connection) ExpectWhole(connection);
    });
    EXPECT_GE(points, 20u);
}

TEST_F(ModuleFaults, ConnectionAnswers) {
    ForEachAllocationFailing([&](AllocationFaults& faults) {
        faults.Disarm();
        const DataConnectionPtr connection = Open();
        ASSERT_TRUE(connection);
        faults.Rearm();
        const bool open = connection->IsOpen();
        const bool available = connection->IsAvailable();
        const bool readable = connection->IsReadable();
        const std::uint32_t type = connection->GetPixelType();
        const Array<String> parameters = connection->GetParameters();
        const String text = connection->GetConnectionString();
        Raster(connection).Create(parameters, RasterProps());
        connection->Close();
        faults.Disarm();
        EXPECT_TRUE(open);
        EXPECT_TRUE(available);
        EXPECT_TRUE(readable);
        EXPECT_EQ(type, 4u);
        EXPECT_TRUE(text.wide == nullptr || text.Find("{MemoryRaster}@") == 0u);
        EXPECT_FALSE(connection->IsOpen());
    });
}

TEST_F(ModuleFaults, ReopeningEndsOpenOrClosed) {
    ForEachAllocationFailing([&](AllocationFaults& faults) {
        faults.Disarm();
        const DataConnectionPtr connection = Open();
        ASSERT_TRUE(connection);
        Array<String> parameters;
        parameters.Append(argument.data[1]);
        faults.Rearm();
        const bool opened = connection->Open(parameters, geoRef, MetadataPtr());
        const bool failed = faults.Failed() != 0;
        faults.Disarm();
        EXPECT_TRUE(opened || failed);
        EXPECT_EQ(connection->IsOpen(), opened);
        if (opened) ExpectWhole(connection);
        EXPECT_TRUE(connection->Open(parameters, geoRef, MetadataPtr()));
        EXPECT_TRUE(connection->IsOpen());
    });
}

TEST_F(ModuleFaults, PropertiesAndReaderAreWholeOrNeutral) {
    ForEachAllocationFailing([&](AllocationFaults& faults) {
        faults.Disarm();
        const DataConnectionPtr connection = Open();
        ASSERT_TRUE(connection);
        faults.Rearm();
        const RasterReaderDispatchPtr dispatch = Raster(connection).GetReader();
        const RasterProps props = Raster(connection).GetRasterProps();
        faults.Disarm();
        if (dispatch && dispatch->IsValidLevel()) {
            EXPECT_TRUE(dispatch->As<float>());
        }
        if (props.pixelType != 0) {
            EXPECT_EQ(props.samples, kSamples);
        }
    });
}

TEST_F(ModuleFaults, ReaderAnswers) {
    const DataConnectionPtr connection = Open();
    const RasterReaderDispatchPtr dispatch = Raster(connection).GetReader();
    ASSERT_TRUE(dispatch);
    RasterReader<float>& reader = *dispatch->As<float>();
    RasterProps noData = reader.GetRasterProps();
    noData.SetNoDataValue(1, 13.0);
    reader.SetNoDataValues(noData);
    const std::size_t points = ForEachAllocationFailing([&](AllocationFaults& faults) {
        try {
            const RasterProps props = reader.GetRasterProps();
            const RasterBandStats<float> stats = reader.GetBandStats(0);
            const Array<RasterBandHistogram<float>> histograms = reader.GetHistograms();
            const PalettePtr palette = reader.GetPalette(0);
            reader.SetBandStats(Array<RasterBandStats<float>>());
            reader.SetHistograms(histograms);
            reader.SetPalette(0, Palette());
            reader.SetNoDataValues(noData);
            static_cast<void>(reader.GetNoDataValue(1));
            static_cast<void>(reader.HasNoDataValue(1));
            faults.Disarm();
            EXPECT_EQ(stats.flags, 0u);
            EXPECT_FALSE(palette && !palette->colors.empty());
        } catch (...) {
            faults.Disarm();
            ADD_FAILURE() << "thrown across the interface";
        }
        EXPECT_EQ(reader.GetSamples(0), kSamples);
    });
    EXPECT_GE(points, 5u);
}

TEST_F(ModuleFaults, TilesAreMovedOrLeftAlone) {
    const DataConnectionPtr connection = Open();
    const RasterReaderDispatchPtr dispatch = Raster(connection).GetReader();
    ASSERT_TRUE(dispatch);
    RasterReader<float>& reader = *dispatch->As<float>();
    const auto original = pixels;
    int bandNumbers[] = {1, 0};
    const Array<int> bands(bandNumbers, ArrayShape(2));
    ForEachAllocationFailing([&](AllocationFaults& faults) {
        std::array<float, 8> tile{};
        std::array<unsigned char, 8> mask{};
        const bool read = reader.ReadTile(1, 1, 2, 2, bands, 0, tile.data(), mask.data());
        const bool wrote = reader.WriteTile(1, 1, 2, 2, bands, 0, tile.data(), mask.data());
        const bool failed = faults.Failed() != 0;
        faults.Disarm();
        EXPECT_TRUE(read || failed);
        EXPECT_TRUE(wrote || failed);
        if (read) {
            EXPECT_EQ(tile[0], original[kSamples * kLines + kSamples + 1]);
        }
        if (read) {
            EXPECT_EQ(pixels, original);
        }
        pixels = original;
    });
}

}  // namespace
}  // namespace zelm
