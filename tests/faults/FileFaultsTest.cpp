// The failing file functions themselves: that they count what they should and fail what they say.
#include "tests/support/FileFaults.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>

#include "platform/File.h"
#include "platform/FileSystem.h"
#include "platform/TextConversion.h"
#include "tests/support/ChildProcess.h"
#include "tests/support/ScratchDirectory.h"

namespace zmctest {
namespace {

using platform::File;

class FileFaultsTest : public testing::Test {
protected:
    FileFaultsTest() : name(folder / "file"), wide(name.begin(), name.end()) {}

    FileFault Fault(unsigned calls, std::size_t n, FileFaultAction action, int error = 0) {
        return {folder.String(), calls, n, false, action, error};
    }
    std::unique_ptr<File> Make() { return File::Open(wide.c_str(), File::Mode::Create); }

    zmctest::ScratchDirectory folder;
    std::string name;
    std::u16string wide;
    char bytes[10] = "abcdefghi";
};

TEST_F(FileFaultsTest, CountsTheCallsOfEachKind) {
    const std::pair<unsigned, std::size_t> expected[] = {
        {kOpenCall, 1},  {kReadCall, 2},   {kWriteCall, 1},  {kResizeCall, 1}, {kSyncCall, 1},
        {kCloseCall, 1}, {kRenameCall, 1}, {kRemoveCall, 1}, {kStatusCall, 2}};
    for (const auto& [calls, times] : expected) {
        FileFaults faults(Fault(calls, 0, FileFaultAction::Error));
        {
            const auto file = Make();
            file->WriteAt(0, bytes, sizeof bytes);
            file->ReadAt(0, bytes, sizeof bytes);
            file->ReadAt(5, bytes, 5);
            file->Size();
            file->Sync();
        }
        platform::RenameFile(name, name + "2");
        platform::RemoveEntry(name + "2");
        EXPECT_EQ(faults.Count(), times) << calls;
        EXPECT_EQ(faults.Failed(), 0u);
    }
}

TEST_F(FileFaultsTest, FilesElsewhereDoNotCount) {
    zmctest::ScratchDirectory other;
    FileFaults faults(Fault(kAnyCall, 1, FileFaultAction::Error, EIO));
    zmctest::WriteText(other / "file", "text");
    EXPECT_EQ(zmctest::ReadText(other / "file"), "text");
    EXPECT_EQ(faults.Count(), 0u);
}

TEST_F(FileFaultsTest, StreamsOfTheLibraryCountToo) {
    FileFaults faults(Fault(kWriteCall, 1, FileFaultAction::Error, ENOSPC));
    zmctest::WriteText(name, "text");
    EXPECT_EQ(faults.Failed(), 1u);
    EXPECT_EQ(std::filesystem::file_size(name), 0u);
}

TEST_F(FileFaultsTest, FailsOnceOrFromThenOn) {
    const auto file = Make();
    FileFault fault = Fault(kWriteCall, 2, FileFaultAction::Error, EIO);
    for (const bool forGood : {false, true}) {
        fault.fromThenOn = forGood;
        FileFaults faults(fault);
        EXPECT_EQ(file->WriteAt(0, bytes, 4), 4u);
        EXPECT_EQ(file->WriteAt(0, bytes, 4), 0u);
        EXPECT_EQ(file->WriteAt(0, bytes, 4), forGood ? 0u : 4u);
    }
}

TEST_F(FileFaultsTest, TransfersGoOnAfterShortCountsAndInterruptions) {
    const auto file = Make();
    FileFault fault = Fault(kReadCall | kWriteCall, 1, FileFaultAction::Short);
    fault.fromThenOn = true;
    {
        FileFaults faults(fault);
        EXPECT_EQ(file->WriteAt(0, bytes, 8), 8u);
        EXPECT_EQ(faults.Count(), 4u) << "4, 2, 1 and 1 bytes";
    }
    FileFaults faults(Fault(kReadCall | kWriteCall, 1, FileFaultAction::Error, EINTR));
    char read[8];
    EXPECT_EQ(file->ReadAt(0, read, 8), 8u);
    EXPECT_EQ(std::string(read, 8), "abcdefgh");
    EXPECT_EQ(faults.Failed(), 1u);
}

TEST_F(FileFaultsTest, OpenInterruptedIsTriedAgain) {
    FileFaults faults(Fault(kOpenCall, 1, FileFaultAction::Error, EINTR));
    EXPECT_TRUE(Make());
    EXPECT_EQ(faults.Count(), 2u);
}

// The opening of a new file empties it first, so the call that is interrupted is that of Open too.
TEST_F(FileFaultsTest, EveryCallOfALifeIsMadeAgainWhenInterrupted) {
    for (const unsigned calls : {kOpenCall, kReadCall, kWriteCall, kResizeCall, kSyncCall})
        for (const std::size_t n : {1u, 2u}) {
            SCOPED_TRACE(std::to_string(calls) + ", call " + std::to_string(n));
            FileFaults faults(Fault(calls, n, FileFaultAction::Error, EINTR));
            const auto file = Make();
            ASSERT_TRUE(file);
            EXPECT_EQ(file->WriteAt(0, bytes, sizeof bytes), sizeof bytes);
            EXPECT_EQ(file->ReadAt(0, bytes, sizeof bytes), sizeof bytes);
            EXPECT_TRUE(file->Truncate(5));
            EXPECT_TRUE(file->Sync());
            EXPECT_EQ(faults.Failed(), n == 1 || calls == kResizeCall ? 1u : 0u);
        }
}

TEST_F(FileFaultsTest, OpenThatCannotLookOrEmptyGivesNothing) {
    zmctest::WriteText(name, "old");
    for (const unsigned kind : {kOpenCall, kStatusCall, kResizeCall}) {
        FileFaults faults(Fault(kind, 1, FileFaultAction::Error, EIO));
        EXPECT_FALSE(Make());
        EXPECT_EQ(faults.Failed(), 1u);
    }
    EXPECT_EQ(zmctest::ReadText(name), "old");
}

TEST_F(FileFaultsTest, ProcessEndsInTheMiddleOfAWrite) {
    const pid_t child = fork();
    if (child == 0) {
        const auto file = Make();
        FileFaults faults(Fault(kWriteCall, 2, FileFaultAction::KillPartway));
        file->WriteAt(0, "1234", 4);
        file->WriteAt(0, "abcd", 4);
        _exit(0);
    }
    int status = 0;
    waitpid(child, &status, 0);
    EXPECT_TRUE(WIFSIGNALED(status));
    EXPECT_EQ(zmctest::ReadText(name), "ab34");
}

TEST_F(FileFaultsTest, ChildrenTakeTheirOrderFromTheEnvironment) {
    zmctest::ScratchDirectory other;
    const auto order =
        FileFaults::ForChild(Fault(kWriteCall, 1, FileFaultAction::Error, ENOSPC), other / "count");
    const zmctest::ChildResult result =
        zmctest::RunChild({"/bin/cp", "/proc/self/status", name}, order);
    EXPECT_EQ(result.status, 1);
    EXPECT_NE(result.err.find("No space left"), std::string::npos) << result.err;
    EXPECT_EQ(zmctest::ReadText(other / "count"), "1\n");
}

}  // namespace
}  // namespace zmctest
