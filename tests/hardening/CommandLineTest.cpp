// What a binary does not show, from the commands that compiled it.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <nlohmann/json.hpp>
#include <set>
#include <string>

#include "tests/support/ScratchDirectory.h"

namespace {

using ::testing::HasSubstr;

// Folders whose sources end up in something that is shipped.
const std::set<std::string> shippedFolders{
    "platform", "files",   "core",     "metadata",   "colour",   "format", "raster",
    "dispatch", "pyramid", "coordsys", "connection", "zmcg",     "zmcpe",  "loader",
    "host",     "gdal",    "render",   "tools",      "describe", "serve"};

TEST(HardeningCommandLine, EverySourceThatIsShippedHasTheFlags) {
#ifndef ZMC_HARDENED
    GTEST_SKIP() << "not a hardened build";
#endif
    const std::string text = zmctest::ReadText(ZMC_BUILD_DIR "/compile_commands.json");
    const auto commands = nlohmann::json::parse(text, nullptr, false);
    ASSERT_TRUE(commands.is_array());

    std::set<std::string> seen;
    for (const auto& entry : commands) {
        const std::filesystem::path file(entry.at("file").get<std::string>());
        const std::string folder = file.lexically_relative(ZMC_SOURCE_DIR).begin()->string();
        if (!shippedFolders.contains(folder)) continue;
        const auto command = entry.at("command").get<std::string>();
        // What a test or a fuzz target compiles for itself is not shipped.
        if (command.find(" -o tests/") != command.npos || command.find(" -o fuzz/") != command.npos)
            continue;
        seen.insert(folder);
        for (const char* flag :
             {" -D_FORTIFY_SOURCE=3", " -fstack-protector-strong", " -fstack-clash-protection",
              " -D_GLIBCXX_ASSERTIONS", " -fcf-protection=full", " -O3"})
            EXPECT_THAT(command, HasSubstr(flag)) << file;
        EXPECT_THAT(command, ::testing::AnyOf(HasSubstr(" -fPIC"), HasSubstr(" -fPIE"))) << file;
    }
    // Drivers and programs are left out of some builds.
    std::set<std::string> wanted = shippedFolders;
#ifndef ZMC_PLUGIN_BINARY
    wanted.erase("gdal");
#endif
#ifndef ZMC_COMMAND_BINARY
    for (const char* folder : {"tools", "render", "describe", "serve"}) wanted.erase(folder);
#endif
    EXPECT_EQ(seen, wanted);
}

}  // namespace
