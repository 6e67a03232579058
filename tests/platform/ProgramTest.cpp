// What a process finds out about itself.
#include "platform/Program.h"

#include <dlfcn.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <memory>

namespace platform {
namespace {

TEST(Program, CodeOfTheProgramIsInItsFile) {
    const std::string file = FileOfCode(reinterpret_cast<const void*>(&IsAbsolutePath));
    EXPECT_EQ(file, std::filesystem::read_symlink("/proc/self/exe").string());
    EXPECT_TRUE(IsAbsolutePath(file));
}

TEST(Program, CodeOfALibraryIsInItsFileWhateverItWasLoadedAs) {
    const std::string before = std::filesystem::current_path();
    const std::filesystem::path module = ZMC_MODULE_PATH;
    ASSERT_EQ(chdir(module.parent_path().c_str()), 0);
    void* const library = dlopen(("./" + module.filename().string()).c_str(), RTLD_NOW);
    ASSERT_EQ(chdir(before.c_str()), 0);
    ASSERT_NE(library, nullptr) << dlerror();
    const void* const code = dlsym(library, "CreateDataConnectionFactory");
    EXPECT_EQ(FileOfCode(code), std::filesystem::canonical(module).string());
    dlclose(library);
}

TEST(Program, DataAndNothingHaveNoFile) {
    const std::unique_ptr<int> data = std::make_unique<int>(1);
    EXPECT_EQ(FileOfCode(data.get()), "");
    EXPECT_EQ(FileOfCode(nullptr), "");
}

TEST(Program, VariablesOfTheEnvironment) {
    setenv("ZMC_PROGRAM_TEST", "value", 1);
    EXPECT_EQ(EnvironmentValue("ZMC_PROGRAM_TEST"), "value");
    unsetenv("ZMC_PROGRAM_TEST");
    EXPECT_EQ(EnvironmentValue("ZMC_PROGRAM_TEST"), "");
}

TEST(Program, AbsolutePaths) {
    EXPECT_TRUE(IsAbsolutePath("/lib/x.so"));
    for (const char* const path : {"", "x.so", "./x.so", "../x.so", "~/x.so"})
        EXPECT_FALSE(IsAbsolutePath(path)) << path;
}

}  // namespace
}  // namespace platform
