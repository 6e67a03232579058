// Finding and loading the module.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>
#include <xercesc/util/PlatformUtils.hpp>

#include <cstdlib>
#include <filesystem>
#include <thread>
#include <vector>

#include "loader/OpenModule.h"
#include "tests/support/ScratchDirectory.h"

namespace zmcraster {
namespace {

using testing::HasSubstr;

class OpenModuleTest : public testing::Test {
protected:
    OpenModuleTest() { unsetenv("ZMCRASTER_MODULE"); }
    ~OpenModuleTest() override { unsetenv("ZMCRASTER_MODULE"); }
};

TEST_F(OpenModuleTest, FindsTheModuleBesideItsOwnLibrary) {
    LoadedModule module = OpenModule();
    ASSERT_TRUE(module) << module.reason;
    EXPECT_TRUE(std::filesystem::equivalent(module.path, ZMC_MODULE_PATH)) << module.path;
    zelm::DataConnectionFactory* const factory = module.create("Pyramid");
    ASSERT_NE(factory, nullptr);
    EXPECT_TRUE(factory->IsRasterFactory());
    module.destroy(factory);
    CloseModule(module);
    EXPECT_FALSE(module);
    EXPECT_EQ(module.create, nullptr);
}

TEST_F(OpenModuleTest, LooksNowhereBelowTheWorkingDirectory) {
    const zmctest::ScratchDirectory folder;
    const std::string before = std::filesystem::current_path();
    for (const char* const place : {"zmcraster", "lib", "lib/zmcraster"}) {
        std::filesystem::create_directories(folder / place);
        zmctest::WriteText(folder / (std::string(place) + "/libzmcraster.so"), "no library");
    }
    zmctest::WriteText(folder / "libzmcraster.so", "no library");
    ASSERT_EQ(chdir((folder / ".").c_str()), 0);
    const std::string found = FindModule();
    ASSERT_EQ(chdir(before.c_str()), 0);
    EXPECT_TRUE(std::filesystem::equivalent(found, ZMC_MODULE_PATH)) << found;
}

TEST_F(OpenModuleTest, TheEnvironmentNamesAnotherByItsAbsolutePath) {
    const zmctest::ScratchDirectory folder;
    const std::string link = folder / "another.so";
    std::filesystem::create_symlink(ZMC_MODULE_PATH, link);
    setenv("ZMCRASTER_MODULE", link.c_str(), 1);
    EXPECT_EQ(FindModule(), link);
    LoadedModule module = OpenModule();
    EXPECT_TRUE(module) << module.reason;
    EXPECT_EQ(module.path, link);
    CloseModule(module);
    // What is named is taken or refused: nothing else is tried in its place.
    setenv("ZMCRASTER_MODULE", (folder / "missing.so").c_str(), 1);
    EXPECT_THAT(OpenModule().reason, HasSubstr("no such file"));
}

TEST_F(OpenModuleTest, ARelativePathInTheEnvironmentIsRefused) {
    for (const char* const path : {"libzmcraster.so", "./libzmcraster.so", "../libzmcraster.so"}) {
        setenv("ZMCRASTER_MODULE", path, 1);
        const LoadedModule module = OpenModule();
        EXPECT_FALSE(module);
        EXPECT_EQ(module.path, path);
        EXPECT_THAT(module.reason, HasSubstr("ZMCRASTER_MODULE must hold an absolute path"));
    }
}

TEST_F(OpenModuleTest, AnEmptyVariableIsNone) {
    setenv("ZMCRASTER_MODULE", "", 1);
    LoadedModule module = OpenModule();
    EXPECT_TRUE(module) << module.reason;
    CloseModule(module);
}

TEST_F(OpenModuleTest, TellsWhyAFileIsNoModule) {
    const zmctest::ScratchDirectory folder;
    zmctest::WriteText(folder / "text.so", "no library");
    EXPECT_THAT(OpenModule(folder / "missing.so").reason, HasSubstr("no such file"));
    EXPECT_THAT(OpenModule(folder / "text.so").reason, HasSubstr("no loadable library"));
    EXPECT_THAT(OpenModule(folder / "\xff.so").reason, HasSubstr("not valid UTF-8"));
    const LoadedModule other = OpenModule("libtbb.so.12");
    EXPECT_THAT(other.reason, HasSubstr("its two functions are not in it"));
    EXPECT_EQ(other.create, nullptr);
    EXPECT_EQ(other.path, "libtbb.so.12");
}

TEST_F(OpenModuleTest, StartsXercesForTheModule) {
    ASSERT_EQ(StartXerces(), "");
    LoadedModule module = OpenModule();
    ASSERT_TRUE(module) << module.reason;
    EXPECT_NE(xercesc::XMLPlatformUtils::fgMemoryManager, nullptr);
    CloseModule(module);
}

TEST_F(OpenModuleTest, OpensAndClosesOnManyThreads) {
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i)
        threads.emplace_back([] {
            for (int round = 0; round < 10; ++round) {
                LoadedModule module = OpenModule();
                EXPECT_TRUE(module) << module.reason;
                CloseModule(module);
            }
        });
    for (std::thread& thread : threads) thread.join();
}

TEST_F(OpenModuleTest, ClosingWhatIsNotOpenDoesNothing) {
    LoadedModule module;
    CloseModule(module);
    EXPECT_FALSE(module);
}

}  // namespace
}  // namespace zmcraster
