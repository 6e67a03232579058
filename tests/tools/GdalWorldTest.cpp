#include "tools/GdalWorld.h"

#include <cpl_error.h>
#include <cpl_vsi.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <string>
#include <vector>

#include "tests/support/AllocationFaults.h"

namespace zmctools {
namespace {

namespace fs = std::filesystem;

using zmctest::AllocationFaults;
using zmctest::ForEachAllocationFailing;

class GdalWorld : public testing::Test {
protected:
    // What decides how drivers write, of a folder that there is and one that there is not.
    static std::vector<int> WayOfWriting() {
        std::vector<int> answers;
        for (const char* const name : {"/tmp/file", "/nonesuch/file"})
            answers.insert(answers.end(), {VSISupportsSequentialWrite(name, false),
                                           VSISupportsRandomWrite(name, false),
                                           VSIHasOptimizedReadMultiRange(name)});
        return answers;
    }

    static void SetUpTestSuite() {
        before = WayOfWriting();
        StartGdal();
    }

    static inline std::vector<int> before;
};

// Longer than what a text holds without memory of its own.
constexpr const char* kText = "a text of which there are more than a few letters in the message";

TEST_F(GdalWorld, ErrorsWithoutMemoryAreErrors) {
    ForEachAllocationFailing([](AllocationFaults& faults) {
        EXPECT_NO_THROW(CPLError(CE_Failure, CPLE_AppDefined, "%s", kText));
        faults.Disarm();
        const std::string told = TakeGdalError("file");
        EXPECT_EQ(told, faults.Failed() != 0 ? "out of memory" : kText);
    });
}

TEST_F(GdalWorld, WarningsWithoutMemoryAreToldInOtherWords) {
    int number = 0;
    ForEachAllocationFailing([&](AllocationFaults& faults) {
        faults.Disarm();
        testing::internal::CaptureStderr();
        const std::string text = kText + std::to_string(++number);
        faults.Rearm();
        EXPECT_NO_THROW(CPLError(CE_Warning, CPLE_AppDefined, "%s", text.c_str()));
        faults.Disarm();
        const std::string told = testing::internal::GetCapturedStderr();
        EXPECT_EQ(told, faults.Failed() != 0
                            ? "zmcraster: warning: out of memory, and what it was about is lost\n"
                            : "zmcraster: : warning: " + text + "\n");
        EXPECT_EQ(TakeGdalError("file"), "");
    });
}

TEST_F(GdalWorld, FilesWithoutMemoryDoNotOpen) {
    const std::string name = "/tmp/" + std::string(100, 'n') + std::to_string(getpid());
    ForEachAllocationFailing([&](AllocationFaults& faults) {
        errno = 0;
        EXPECT_NO_THROW(EXPECT_EQ(VSIFOpenL(name.c_str(), "rb"), nullptr));
        const int error = errno;
        faults.Disarm();
        EXPECT_EQ(error, faults.Failed() != 0 ? ENOMEM : ENOENT);
    });
}

TEST_F(GdalWorld, WhatIsNoFileDoesNotOpen) {
    const std::string pipe = "/tmp/zmcpipe" + std::to_string(getpid());
    ASSERT_EQ(mkfifo(pipe.c_str(), 0600), 0);
    EXPECT_EQ(VSIFOpenL(pipe.c_str(), "rb"), nullptr);
    EXPECT_EQ(errno, EINVAL);
    fs::remove(pipe);
}

TEST_F(GdalWorld, DriversWriteAsTheyDoElsewhere) {
    EXPECT_EQ(WayOfWriting(), before);
    EXPECT_NE(before, std::vector<int>(before.size(), 1)) << "GDAL refuses nothing by itself";
}

// What GDAL keeps of a file of bytes once strips of 4000 pixels are asked for.
class Blocks : public GdalWorld {
protected:
    static GIntBig KeptOf(const char* driver, const std::vector<const char*>& options,
                          bool masked) {
        constexpr const char* kName = "/vsimem/blocks";
        GDALDriver* const maker = GetGDALDriverManager()->GetDriverByName(driver);
        std::vector<const char*> list = options;
        list.push_back(nullptr);
        const DatasetPtr made(
            maker->Create(kName, 100000, 5000, 3, GDT_Byte, const_cast<char**>(list.data())));
        EXPECT_TRUE(!masked || made->CreateMaskBand(GMF_PER_DATASET) == CE_None);
        GDALSetCacheMax64(kUsual);
        KeepBlocksForStrips(*made, 4000);
        return GDALGetCacheMax64();
    }

    static constexpr GIntBig kUsual = GIntBig{96} << 20;
};

TEST_F(Blocks, AreKeptForStripsOfTiledFiles) {
    const std::vector<const char*> tiled = {"TILED=YES", "SPARSE_OK=TRUE"};
    const GIntBig kept = KeptOf("GTiff", tiled, false);
    EXPECT_GE(kept, 4000 * 3 * (256 + 256));
    EXPECT_LE(kept, 4000 * 3 * (256 + 256) * 2);
    EXPECT_EQ(KeptOf("GTiff", tiled, true), kUsual) << "a mask has other blocks";
}

TEST_F(Blocks, AreKeptForWholeLinesWhereFilesHaveThem) {
    EXPECT_GE(KeptOf("GTiff", {"SPARSE_OK=TRUE"}, false), 100000 * 3 * 256);
    EXPECT_EQ(KeptOf("GTiff", {"SPARSE_OK=TRUE", "BLOCKYSIZE=5000"}, false), kUsual);
}

TEST_F(Blocks, AreKeptAsUsualOfOtherFormats) { EXPECT_EQ(KeptOf("VRT", {}, false), kUsual); }

}  // namespace
}  // namespace zmctools
