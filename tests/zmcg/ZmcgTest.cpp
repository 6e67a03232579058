#include "zmcg/zmcg.h"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdio>
#include <memory>
#include <set>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "core/Object.h"

extern "C" void CodesDrawnAtLoad(unsigned out[6]);

namespace zelm {
namespace {

// The defined dynamic symbols of a library, as `nm` tells them.
std::set<std::string> ExportsOf(const std::string& library) {
    const std::string command = ZMC_NM " -D --defined-only --format=posix '" + library + "'";
    const std::unique_ptr<FILE, int (*)(FILE*)> pipe(popen(command.c_str(), "r"), pclose);
    std::string text;
    std::array<char, 4096> block;
    while (const std::size_t got = std::fread(block.data(), 1, block.size(), pipe.get()))
        text.append(block.data(), got);
    std::set<std::string> names;
    std::istringstream lines(text);
    for (std::string line; std::getline(lines, line);) names.insert(line.substr(0, line.find(' ')));
    return names;
}

TEST(Zmcg, ExportsExactlyTheThirteenNames) {
    const std::set<std::string> contract{"GloballyUniqueObjectTypeCode",
                                         "GloballyUniqueObjectErrorCode",
                                         "gCdfFormatRecords",
                                         "gCdfFormatRecordCount",
                                         "gpMetadataParseLogInstance",
                                         "GetGlobalEnvironmentImpl",
                                         "gpCoordSysMutex",
                                         "gpCoordSysLogInstance",
                                         "gpCoordSysFactoryInstance",
                                         "fp_Esri_Pe_Initialize",
                                         "fp_Esri_Pe_CreateFromString",
                                         "fp_Esri_Pe_CreateFromCode",
                                         "fp_Esri_Pe_Release"};
    EXPECT_EQ(ExportsOf(ZMCG_PATH), contract);
}

TEST(Zmcg, EqualWordsHaveEqualCodesAndOthersDiffer) {
    const unsigned a = GloballyUniqueObjectTypeCode("word a");
    const unsigned b = GloballyUniqueObjectTypeCode("word b");
    EXPECT_NE(a, 0u);
    EXPECT_NE(a, b);
    EXPECT_EQ(GloballyUniqueObjectTypeCode(String("word ") + String("a")), a);
    const unsigned null = GloballyUniqueObjectTypeCode(String());
    EXPECT_EQ(GloballyUniqueObjectTypeCode(String()), null);
    EXPECT_NE(GloballyUniqueObjectTypeCode(""), null);
    EXPECT_EQ(GloballyUniqueObjectTypeCode("Object"), Object::typeCode);
}

TEST(Zmcg, FormatTableHoldsBothKinds) {
    std::vector<String> names;
    for (std::int32_t i = 0; i < gCdfFormatRecordCount; ++i)
        names.emplace_back(gCdfFormatRecords[i].name);
    EXPECT_NE(std::find(names.begin(), names.end(), String("MemoryRaster")), names.end());
    EXPECT_NE(std::find(names.begin(), names.end(), String("Pyramid")), names.end());
}

TEST(Zmcg, SingletonsAreNullUntilMade) {
    EXPECT_EQ(gpCoordSysMutex, nullptr);
    EXPECT_EQ(gpCoordSysLogInstance, nullptr);
    EXPECT_EQ(gpCoordSysFactoryInstance, nullptr);
    EXPECT_EQ(fp_Esri_Pe_Initialize, nullptr);
    EXPECT_EQ(fp_Esri_Pe_CreateFromString, nullptr);
    EXPECT_EQ(fp_Esri_Pe_CreateFromCode, nullptr);
    EXPECT_EQ(fp_Esri_Pe_Release, nullptr);
}

TEST(Zmcg, SettingsAreOneTableOrderedByCodeUnits) {
    EnvironmentImpl& environment = GetGlobalEnvironmentImpl();
    EXPECT_EQ(&environment, &GetGlobalEnvironmentImpl());
    std::map<String, String> settings;
    settings["b"] = "2";
    settings["B"] = "1";
    settings[String()] = "0";
    EXPECT_EQ(settings.begin()->first.wide, nullptr);
    EXPECT_TRUE(std::next(settings.begin())->first == "B");
}

void ExpectUsableAtLoad(const unsigned (&codes)[6]) {
    EXPECT_NE(codes[0], 0u);
    EXPECT_EQ(codes[1], codes[0]);
    EXPECT_EQ(codes[0], GloballyUniqueObjectTypeCode("Drawn at load"));
    EXPECT_EQ(codes[2], Object::typeCode);
    EXPECT_NE(codes[3], 0u);
    EXPECT_NE(codes[3], codes[4]);
    EXPECT_EQ(codes[5], 2u);
    EXPECT_TRUE(GetGlobalEnvironmentImpl().settings["Set at load"] == "kept");
}

TEST(ZmcgAtLoad, ALinkedLibraryDrawsCodesBeforeMain) {
    unsigned codes[6] = {};
    CodesDrawnAtLoad(codes);
    ExpectUsableAtLoad(codes);
}

TEST(ZmcgAtLoad, ALoadedLibraryDrawsCodesWhileItLoads) {
    void* const library = dlopen(ZMC_LOADED_EARLY_USER, RTLD_NOW | RTLD_LOCAL);
    ASSERT_NE(library, nullptr) << dlerror();
    const auto draw = reinterpret_cast<void (*)(unsigned*)>(dlsym(library, "CodesDrawnAtLoad"));
    ASSERT_NE(draw, nullptr);
    EXPECT_NE(draw, &CodesDrawnAtLoad);
    unsigned codes[6] = {};
    draw(codes);
    ExpectUsableAtLoad(codes);
    dlclose(library);
}

TEST(ZmcgThreads, ErrorCodesNeverRepeatAndAreNeverZero) {
    constexpr std::size_t kEach = 20000;
    std::array<std::vector<unsigned>, 8> drawn;
    std::vector<std::thread> threads;
    for (auto& mine : drawn)
        threads.emplace_back([&mine] {
            for (std::size_t i = 0; i < kEach; ++i) mine.push_back(GloballyUniqueObjectErrorCode());
        });
    for (auto& thread : threads) thread.join();
    std::set<unsigned> all;
    for (const auto& mine : drawn) all.insert(mine.begin(), mine.end());
    EXPECT_EQ(all.size(), kEach * drawn.size());
    EXPECT_EQ(all.count(0), 0u);
}

TEST(ZmcgThreads, EveryThreadGetsTheSameCodeForAWord) {
    std::array<std::vector<unsigned>, 8> drawn;
    std::vector<std::thread> threads;
    for (auto& mine : drawn)
        threads.emplace_back([&mine] {
            for (int i = 0; i < 200; ++i) {
                const std::string word = "thread word " + std::to_string(i);
                mine.push_back(GloballyUniqueObjectTypeCode(String(word.c_str())));
            }
        });
    for (auto& thread : threads) thread.join();
    for (const auto& mine : drawn) EXPECT_EQ(mine, drawn[0]);
    const std::set<unsigned> distinct(drawn[0].begin(), drawn[0].end());
    EXPECT_EQ(distinct.size(), 200u);
    EXPECT_EQ(distinct.count(0), 0u);
}

}  // namespace
}  // namespace zelm
