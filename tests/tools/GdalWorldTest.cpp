#include "tools/GdalWorld.h"

#include <cpl_error.h>
#include <cpl_vsi.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <string>

#include "tests/support/AllocationFaults.h"

namespace zmctools {
namespace {

namespace fs = std::filesystem;

using zmctest::AllocationFaults;
using zmctest::ForEachAllocationFailing;

class GdalWorld : public testing::Test {
protected:
    static void SetUpTestSuite() { StartGdal(); }
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

}  // namespace
}  // namespace zmctools
