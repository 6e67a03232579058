// The module loaded and unloaded a thousand times, in every order that a host may do it in: nothing
// of it stays behind, neither descriptors nor mappings nor memory.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <functional>
#include <optional>

#include "connection/DataConnectionFactory.h"
#include "host/raster/Raster.h"
#include "tests/support/CampaignLength.h"
#include "tests/support/ChildProcess.h"
#include "tests/support/CountingGeoRef.h"
#include "tests/support/Holdings.h"
#include "tests/support/MemoryRaster.h"
#include "tests/support/Sanitizers.h"
#include "tests/support/ScratchDirectory.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {
namespace {

using namespace zelm;

// What waits in the C library's per-thread caches counts as allocated, and comes and goes; the
// program starts itself again without them. They are settled before main, so this is too.
[[gnu::constructor]] void StartWithoutThreadCaches(int, char** argv, char**) {
    if (std::getenv("GLIBC_TUNABLES")) return;
    setenv("GLIBC_TUNABLES", "glibc.malloc.tcache_count=0", 1);
    execv("/proc/self/exe", argv);
}

// The address sanitizer keeps a record of every global that was ever loaded, about a megabyte for
// each round here, and adds some 600 bytes a round to the heap, and mappings. What is ours to keep
// small is judged to the byte without it.
int Rounds() { return IsSanitized() ? CampaignLength(30, 300) : CampaignLength(200, 1000); }

bool IsModuleMapped() {
    return zmctest::ReadText("/proc/self/maps").find("libzmcraster.so") != std::string::npos;
}

// The module as a host has it that takes its two functions itself.
class LoadedModule {
public:
    LoadedModule() : handle(dlopen(ZMC_MODULE_PATH, RTLD_NOW | RTLD_LOCAL)) {
        if (!handle) return;
        create = reinterpret_cast<decltype(create)>(dlsym(handle, "CreateDataConnectionFactory"));
        destroy = reinterpret_cast<decltype(destroy)>(dlsym(handle, "DeleteDataConnectionFactory"));
        factory = create("Pyramid");
    }
    ~LoadedModule() {
        DeleteFactory();
        EXPECT_EQ(dlclose(handle), 0);
    }
    LoadedModule(const LoadedModule&) = delete;
    LoadedModule& operator=(const LoadedModule&) = delete;

    void DeleteFactory() {
        destroy(factory);
        factory = nullptr;
    }

    void* handle;
    DataConnectionFactory* (*create)(const String&) = nullptr;
    void (*destroy)(DataConnectionFactory*) = nullptr;
    DataConnectionFactory* factory = nullptr;
};

RasterDataConnection& AsRaster(const DataConnectionPtr& connection) {
    return static_cast<RasterDataConnection&>(*connection);
}

class LoadUnload : public testing::Test {
protected:
    zmctest::ScratchDirectory folder;
    std::vector<unsigned char> pixels = std::vector<unsigned char>(24, 7);

    std::string MemoryText() const { return zmctest::MemoryRasterText(pixels.data()).Text(); }

    DataConnectionPtr OpenMemory(const LoadedModule& module, GeoRefPtr geoRef = GeoRefPtr()) const {
        return module.factory->Open(zmctest::Argument({"MemoryRaster", MemoryText()}), geoRef,
                                    MetadataPtr());
    }

    static void ReadAll(const RasterReaderDispatchPtr& dispatch) {
        int bands[] = {0, 1};
        std::vector<unsigned char> tile(24), mask(24);
        EXPECT_TRUE(dispatch->As<unsigned char>()->ReadTile(
            0, 0, 4, 3, Array<int>(bands, ArrayShape(2)), 0, tile.data(), mask.data()));
        EXPECT_EQ(tile[23], 7);
    }

    // Runs `round` until the process has settled, and then many times more: it may hold no more
    // afterwards than before.
    static void ExpectNothingStays(const std::function<void(int)>& round) {
        const int rounds = Rounds();
        constexpr int kSettling = 20;
        Holdings before{};
        for (int i = 0; i < rounds + kSettling; ++i) {
            if (i == kSettling) before = HeldNow();
            round(i);
            if (IsModuleMapped()) FAIL() << "still mapped after round " << i;
        }
        const Holdings after = HeldNow();
        std::printf("%d rounds: descriptors %+td, mappings %+td, heap %+td bytes\n", rounds,
                    after.descriptors - before.descriptors, after.mappings - before.mappings,
                    after.heap - before.heap);
        EXPECT_EQ(after.descriptors, before.descriptors);
        EXPECT_LE(after.mappings, before.mappings + (IsSanitized() ? rounds : 2));
        EXPECT_LE(after.heap, before.heap + 1024 * (IsSanitized() ? rounds : 1));
    }
};

TEST_F(LoadUnload, WithNothingButTheFactory) {
    ExpectNothingStays([](int i) {
        LoadedModule module;
        ASSERT_NE(module.factory, nullptr);
        if (i % 2 != 0) module.DeleteFactory();
    });
}

TEST_F(LoadUnload, AfterARefusedOpen) {
    ExpectNothingStays([&](int) {
        const LoadedModule module;
        EXPECT_FALSE(module.factory->Open(zmctest::Argument({"Pyramid", folder / "none"}),
                                          GeoRefPtr(), MetadataPtr()));
        EXPECT_FALSE(module.factory->Open(zmctest::Argument({"MemoryRaster", "SAMPLES=1"}),
                                          GeoRefPtr(), MetadataPtr()));
    });
}

TEST_F(LoadUnload, WithConnectionReaderAndPropertiesInEitherOrder) {
    ExpectNothingStays([&](int i) {
        const LoadedModule module;
        DataConnectionPtr connection = OpenMemory(module);
        ASSERT_TRUE(connection);
        RasterReaderDispatchPtr dispatch = AsRaster(connection).GetReader();
        std::optional<RasterProps> props = AsRaster(connection).GetRasterProps();
        if (i % 2 != 0) connection = DataConnectionPtr();
        if (i % 3 != 0) props.reset();
        ReadAll(dispatch);
    });
}

TEST_F(LoadUnload, WithObjectsThatOutliveTheFactory) {
    ExpectNothingStays([&](int) {
        LoadedModule module;
        const DataConnectionPtr connection = OpenMemory(module);
        module.DeleteFactory();
        ASSERT_TRUE(connection);
        ReadAll(AsRaster(connection).GetReader());
        connection->Close();
    });
}

TEST_F(LoadUnload, WithAPyramidItsRecordsAndItsPalette) {
    ExpectNothingStays([&](int i) {
        const std::string path = folder / "file.pyr";
        const LoadedModule module;
        RasterProps props;
        props.samples = props.lines = 300;
        props.bands = 1;
        props.pixelType = 1;
        props.formatName = "Pyramid";
        PalettePtr palette;
        if (i % 2 == 0) {
            const DataConnectionPtr made = module.factory->Create(zmctest::Argument({path}), props);
            ASSERT_TRUE(made);
            auto& reader = *AsRaster(made).GetReader()->As<unsigned char>();
            const std::int32_t pair[2] = {1, 1};
            ASSERT_TRUE(reader.BuildPyramid(0, 1, 0, pair));
            Palette colours;
            colours.AddColor(Color());
            EXPECT_TRUE(reader.SetPalette(0, colours));
            EXPECT_TRUE(reader.SetBandStats(Array<RasterBandStats<unsigned char>>()));
        }
        const DataConnectionPtr opened =
            module.factory->Open(zmctest::Argument({"Pyramid", path}), GeoRefPtr(), MetadataPtr());
        ASSERT_TRUE(opened);
        palette = AsRaster(opened).GetReader()->As<unsigned char>()->GetPalette(0);
        EXPECT_EQ(palette->nextIndex, 1u);
    });
}

// What the host made itself, and copies into its own objects, are the host's.
TEST_F(LoadUnload, WithTheHostsOwnObjectsAlive) {
    const Metadata metadata;
    Array<String> parameters;
    String name;
    const GeoRefPtr geoRef(new zmctest::CountingGeoRef);
    ExpectNothingStays([&](int) {
        {
            const LoadedModule module;
            const DataConnectionPtr connection = OpenMemory(module, geoRef);
            ASSERT_TRUE(connection);
            parameters = connection->GetParameters();
            name = AsRaster(connection).GetRasterProps().formatName;
        }
        EXPECT_TRUE(parameters.data[0] == "MemoryRaster");
        EXPECT_TRUE(name == "MemoryRaster");
        EXPECT_EQ(zmctest::CountingGeoRef::living, 1);
    });
    EXPECT_TRUE(metadata.IsValid());
}

TEST_F(LoadUnload, WhileAnotherHandleKeepsIt) {
    ExpectNothingStays([&](int) {
        const LoadedModule kept;
        const DataConnectionPtr connection = OpenMemory(kept);
        { const LoadedModule other; }
        EXPECT_TRUE(IsModuleMapped());
        ReadAll(AsRaster(connection).GetReader());
    });
}

// A raster of the host library keeps the module for as long as it lives.
TEST_F(LoadUnload, ByTheHostLibraryWhoseRasterLivesLongest) {
    ExpectNothingStays([&](int) {
        RasterProps props;
        props.samples = 4;
        props.lines = 3;
        props.bands = 2;
        props.interleave = 2;
        props.pixelType = 1;
        zmchost::ModulePtr module = zmchost::Module::Load(ZMC_MODULE_PATH);
        zmchost::Raster raster = zmchost::Raster::OfMemory(module, pixels.data(), props);
        module.reset();
        EXPECT_TRUE(IsModuleMapped());
        EXPECT_EQ(raster.Read<unsigned char>(0, {0, 0, 4, 3}).size(), 24u);
    });
}

// The factory that nobody deletes is lost, and no more.
TEST_F(LoadUnload, FactoryThatNobodyDeletesIsALossAndNoMore) {
    void* const handle = dlopen(ZMC_MODULE_PATH, RTLD_NOW | RTLD_LOCAL);
    ASSERT_NE(handle, nullptr);
    const auto create = reinterpret_cast<DataConnectionFactory* (*)(const String&)>(
        dlsym(handle, "CreateDataConnectionFactory"));
    // The one pointer to it, so that it counts as held.
    static DataConnectionFactory* lost = nullptr;
    lost = create("Pyramid");
    EXPECT_NE(lost, nullptr);
    EXPECT_EQ(dlclose(handle), 0);
    EXPECT_FALSE(IsModuleMapped());
    const LoadedModule again;
    EXPECT_TRUE(again.factory);
}

// A process that has nothing of ours but the path: the libraries under the module come and go too.
TEST_F(LoadUnload, InAProcessWithoutItsLibraries) {
    const std::string rounds = std::to_string(Rounds());
    const zmctest::ChildResult result =
        zmctest::RunChild({ZMC_BARE_LOAD_PROBE, ZMC_MODULE_PATH, rounds});
    EXPECT_EQ(result.status, 0) << result.out << result.err;
    std::printf("%s", result.out.c_str());
}

// The log that the module made is the process's: the host writes on, and so does the next module.
TEST_F(LoadUnload, WhileTheParseLogThatItMadeIsInUse) {
    const zmctest::ChildResult result =
        zmctest::RunChild({ZMC_PARSE_LOG_UNLOAD_PROBE, ZMC_MODULE_PATH},
                          {"metadata_parse_log_dir=" + folder.String(),
                           "metadata_parse_log_level=2", "metadata_parse_log_console=1"});
    EXPECT_EQ(result.status, 0) << result.err;
    const std::string log = zmctest::ReadText(folder / "metadata_parse_log.log");
    EXPECT_NE(log.find("Log Level is set to: 2\n\n"), std::string::npos) << log;
    const std::string lines = log.substr(log.find("to: 2\n\n") + 7);
    EXPECT_EQ(lines,
              "while it is loaded\nafter unload 0, f\u00fcr sich\nafter unload 1, f\u00fcr sich\n"
              "after unload 2, f\u00fcr sich\n");
    EXPECT_NE(result.out.find("after unload 2"), std::string::npos) << result.out;
}

}  // namespace
}  // namespace zmctest
