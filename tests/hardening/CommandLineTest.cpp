// What a binary does not show, from the commands that compiled it.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <nlohmann/json.hpp>
#include <regex>
#include <set>
#include <sstream>
#include <string>

#include "tests/support/ScratchDirectory.h"

namespace {

using ::testing::HasSubstr;

// Folders whose sources end up in something that is shipped.
const std::set<std::string> shippedFolders{
    "platform", "files",   "core",     "metadata",   "colour",   "format", "raster",
    "dispatch", "pyramid", "coordsys", "connection", "zmcg",     "zmcpe",  "loader",
    "host",     "gdal",    "render",   "tools",      "describe", "serve"};

// Of what folders the sources are that `file` is, or, compiled as one, includes.
std::set<std::string> FoldersOf(const std::filesystem::path& file) {
    const auto folder = [](const std::filesystem::path& path) {
        return path.lexically_relative(ZMC_SOURCE_DIR).begin()->string();
    };
    if (file.parent_path().filename() != "Unity") return {folder(file)};
    std::set<std::string> folders;
    std::istringstream lines(zmctest::ReadText(file));
    const std::regex include(R"re(#include "([^"]+)")re");
    for (std::string line; std::getline(lines, line);)
        if (std::smatch found; std::regex_match(line, found, include))
            folders.insert(folder(found[1].str()));
    EXPECT_FALSE(folders.empty()) << file;
    return folders;
}

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
        const auto command = entry.at("command").get<std::string>();
        // What a test or a fuzz target compiles for itself is not shipped.
        if (command.find(" -o tests/") != command.npos || command.find(" -o fuzz/") != command.npos)
            continue;
        bool shipped = false;
        for (const std::string& folder : FoldersOf(file)) {
            if (!shippedFolders.contains(folder)) continue;
            seen.insert(folder);
            shipped = true;
        }
        if (!shipped) continue;
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
