// The file services while memory is out: operations never throw, and what answers with a text or a
// list throws rather than answer with less.
#include <unistd.h>

#include <cerrno>
#include <new>
#include <string>
#include <vector>

#include "platform/FileSystem.h"
#include "platform/Rights.h"
#include "tests/support/AllocationFaults.h"
#include "tests/support/ScratchDirectory.h"

namespace platform {
namespace {

using zmctest::AllocationFaults;
using zmctest::ForEachAllocationFailing;

// Calls `answer` with each allocation failing in turn: it throws std::bad_alloc, or gives what it
// gives otherwise.
template <class Answer>
void ExpectWholeOrThrown(Answer&& answer) {
    const auto whole = answer();
    std::size_t thrown = 0;
    const std::size_t points = ForEachAllocationFailing([&](AllocationFaults& faults) {
        try {
            const auto given = answer();
            faults.Disarm();
            EXPECT_EQ(faults.Failed(), 0u);
            EXPECT_EQ(given, whole);
        } catch (const std::bad_alloc&) {
            ++thrown;
        }
    });
    EXPECT_GE(points, 1u);
    EXPECT_EQ(thrown, 2 * points) << "each in both modes";
}

// Too long for a string to hold in itself.
const std::string kLong(100, 'n');

TEST(FileSystemMemory, TextsAreWholeOrThrown) {
    const std::string path = "/folder" + kLong + "/name" + kLong;
    ExpectWholeOrThrown([&] { return FolderOf(path); });
    ExpectWholeOrThrown([&] { return NameOf(path); });
    ExpectWholeOrThrown([&] { return NameOf(kLong); });
    ExpectWholeOrThrown([&] { return JoinPath(path, kLong); });
    ExpectWholeOrThrown([&] { return JoinPath(".", kLong); });
    ExpectWholeOrThrown([&] { return ResolveLinks(path); });
    ExpectWholeOrThrown([] { return SystemRun(); });
    ExpectWholeOrThrown([] {
        errno = ENAMETOOLONG;
        return LastErrorText();
    });
}

TEST(FileSystemMemory, LinksAreResolvedOrThrown) {
    const zmctest::ScratchDirectory folder;
    zmctest::WriteText(folder / kLong, "text");
    ASSERT_EQ(::symlink((folder / kLong).c_str(), (folder / "far").c_str()), 0);
    ASSERT_EQ(::symlink("far", (folder / "near").c_str()), 0);
    ASSERT_EQ(::symlink("circle", (folder / "circle").c_str()), 0);
    ExpectWholeOrThrown([path = folder / "near"] { return ResolveLinks(path); });
    ExpectWholeOrThrown([path = folder / "circle"] { return ResolveLinks(path); });
}

TEST(FileSystemMemory, AFolderIsListedWholeOrThrown) {
    const zmctest::ScratchDirectory folder;
    for (const char* const end : {"a", "b", "c"}) zmctest::WriteText(folder / (kLong + end), "");
    ExpectWholeOrThrown([path = folder.String()] { return ListFolder(path); });
}

TEST(FileSystemMemory, OperationsTakeNoMemory) {
    const zmctest::ScratchDirectory folder;
    const std::string path = folder / "file";
    const std::string other = folder / "other";
    const std::string place = folder.String();
    bool answers[9] = {};
    const std::size_t allocations = zmctest::CountAllocations([&] {
        answers[0] = CreateNewFile(path);
        answers[1] = StatusOf(path).exists;
        answers[2] = ReserveSpace(path, 1000);
        answers[3] = ReleaseReserve(path);
        answers[4] = SyncFile(path) && SyncFolder(place);
        answers[5] = RenameFile(path, other);
        answers[6] = RenameToNewName(other, path);
        answers[7] = FreeSpace(place).has_value() && CurrentProcess() != 0;
        answers[8] = RandomNumber() != RandomNumber() && RemoveEntry(path);
    });
    EXPECT_EQ(allocations, 0u);
    for (const bool answer : answers) EXPECT_TRUE(answer);
}

// Not one of them is able to throw.
const std::string kPath;
static_assert(noexcept(StatusOf(kPath)) && noexcept(CreateNewFile(kPath)) && noexcept(RenameFile(kPath, kPath)) && noexcept(RenameToNewName(
    kPath,
    kPath)) && noexcept(RemoveEntry(kPath)) && noexcept(SyncFile(kPath)) && noexcept(SyncFolder(kPath)) && noexcept(FreeSpace(kPath)) && noexcept(ReserveSpace(kPath, 0)) && noexcept(ReleaseReserve(kPath)) && noexcept(CurrentProcess()) && noexcept(RandomNumber()) && noexcept(LinkFile(kPath,
                                                                                                                                                                                                                                                                                            kPath)) && noexcept(MakePrivate(kPath)) && noexcept(CopyRights(kPath,
                                                                                                                                                                                                                                                                                                                                                           kPath)) && noexcept(MaySpeakFor({},
                                                                                                                                                                                                                                                                                                                                                                                           {})));

}  // namespace
}  // namespace platform
