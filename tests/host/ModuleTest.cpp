// Loading the module.
#include "host/raster/Module.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <thread>
#include <vector>

#include "host/base/Error.h"
#include "host/base/Xerces.h"
#include "host/raster/Raster.h"
#include "tests/support/FailureOf.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

std::string LoadFailure(const std::string& path) {
    return zmctest::FailureOf([&] { Module::Load(path); });
}

TEST(Module, FailuresNameTheFileAndTheReason) {
    EXPECT_THAT(LoadFailure("/no/such/module.so"),
                testing::AllOf(testing::HasSubstr("/no/such/module.so"),
                               testing::HasSubstr("no such file")));
    const zmctest::ScratchDirectory folder;
    zmctest::WriteText(folder / "text.so", "no library");
    EXPECT_THAT(LoadFailure(folder / "text.so"), testing::HasSubstr("no loadable library"));
    EXPECT_THAT(LoadFailure("libtbb.so.12"), testing::HasSubstr("its two functions are not in it"));
}

TEST(Module, EnvironmentNamesTheDefault) {
    setenv("ZMCRASTER_MODULE", ZMC_MODULE_PATH, 1);
    EXPECT_EQ(Module::DefaultPath(), ZMC_MODULE_PATH);
    EXPECT_EQ(Module::Load()->Path(), ZMC_MODULE_PATH);
    unsetenv("ZMCRASTER_MODULE");
    EXPECT_THAT(Module::DefaultPath(), testing::HasSubstr("zmcraster"));
}

TEST(Module, StaysLoadedAsLongAsRastersLive) {
    zmctest::MemorySource<short> source(4, 3, 1);
    source.FillWithNoise(1);
    ModulePtr module = zmctest::TestModule();
    Raster raster = Raster::OfMemory(module, source.pixels.data(), source.props);
    module.reset();
    EXPECT_EQ(raster.Read<short>(0, {0, 0, 4, 3}), source.pixels);
}

TEST(Module, LoadsAndUnloadsOnManyThreads) {
    std::vector<std::thread> threads;
    for (int i = 0; i < 8; ++i)
        threads.emplace_back([] {
            for (int round = 0; round < 20; ++round) {
                InitialiseXerces();
                zmctest::TestModule();
            }
        });
    for (std::thread& thread : threads) thread.join();
}

TEST(Module, RefusedConnectionsAreEmpty) {
    const ModulePtr module = zmctest::TestModule();
    EXPECT_FALSE(module->OpenPyramid("/no/such/file.zmc"));
    EXPECT_FALSE(module->OpenMemoryRaster("SAMPLES=1"));
}

}  // namespace
}  // namespace zmchost
