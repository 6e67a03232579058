// What the file services answer where the disk refuses, and where there is nothing to serve.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <string>

#include "platform/FileLock.h"
#include "platform/FileSystem.h"
#include "tests/support/FileFaults.h"
#include "tests/support/ScratchDirectory.h"

namespace platform {
namespace {

using zmctest::FileFault;
using zmctest::FileFaults;

class FileSystemFaults : public testing::Test {
protected:
    FileSystemFaults() { zmctest::WriteText(path, "text"); }

    // Runs `call` while every call of that kind fails, or the first alone.
    template <class Call>
    auto Failing(unsigned kind, int error, Call&& call, bool fromThenOn = true) {
        FileFault fault;
        fault.folder = folder.String();
        fault.calls = kind;
        fault.n = 1;
        fault.fromThenOn = fromThenOn;
        fault.error = error;
        FileFaults faults(fault);
        const auto answer = call();
        faults.Disarm();
        EXPECT_NE(faults.Failed(), 0U);
        return answer;
    }

    zmctest::ScratchDirectory folder;
    const std::string path = folder / "file";
    const std::string missing = folder / "missing";
};

TEST_F(FileSystemFaults, SyncingTellsWhetherItReachedTheDisk) {
    EXPECT_TRUE(SyncFile(path));
    EXPECT_TRUE(SyncFolder(folder.String()));
    EXPECT_FALSE(SyncFile(missing));
    EXPECT_FALSE(SyncFolder(path)) << "it is no folder";
    EXPECT_FALSE(Failing(zmctest::kSyncCall, EIO, [&] { return SyncFile(path); }));
    EXPECT_FALSE(Failing(zmctest::kOpenCall, EMFILE, [&] { return SyncFile(path); }));
}

TEST_F(FileSystemFaults, AFailureKeepsItsReason) {
    EXPECT_FALSE(Failing(zmctest::kSyncCall, EIO, [&] {
        const bool synced = SyncFile(path);
        EXPECT_EQ(errno, EIO) << "closing comes later, and does not count";
        return synced;
    }));
    EXPECT_FALSE(CreateNewFile(path));
    EXPECT_NE(LastErrorText(), "");
}

TEST_F(FileSystemFaults, ReservingFailsForWantOfSpaceAlone) {
    constexpr std::uint64_t size = 1 << 20;
    const auto reserve = [&] { return ReserveSpace(path, size); };
    EXPECT_TRUE(reserve());
    EXPECT_EQ(StatusOf(path).size, 4U) << "the file stays as long as it was";
    for (const int error : {ENOSPC, EDQUOT, EFBIG})
        EXPECT_FALSE(Failing(zmctest::kResizeCall, error, reserve)) << error;
    for (const int error : {EOPNOTSUPP, EIO})
        EXPECT_TRUE(Failing(zmctest::kResizeCall, error, reserve)) << error;
    EXPECT_FALSE(ReserveSpace(missing, size));
}

TEST_F(FileSystemFaults, ReleasingKeepsTheText) {
    EXPECT_TRUE(ReserveSpace(path, 1 << 20));
    const auto release = [&] { return ReleaseReserve(path); };
    EXPECT_FALSE(Failing(zmctest::kStatusCall, EIO, release));
    EXPECT_FALSE(Failing(zmctest::kResizeCall, EIO, release));
    EXPECT_TRUE(release());
    EXPECT_EQ(zmctest::ReadText(path), "text");
    EXPECT_FALSE(ReleaseReserve(missing));
}

TEST_F(FileSystemFaults, NewNamesOnDisksThatDoNotKnowTheService) {
    const std::string other = folder / "other";
    const auto rename = [&] { return RenameToNewName(path, other); };
    EXPECT_FALSE(Failing(zmctest::kRenameCall, EIO, rename));
    EXPECT_TRUE(StatusOf(path).exists);
    for (const int error : {EINVAL, ENOSYS}) {
        zmctest::WriteText(path, "text");
        RemoveEntry(other);
        EXPECT_FALSE(Failing(zmctest::kRenameCall, error, rename)) << "nor links";
        EXPECT_FALSE(StatusOf(other).exists);
        EXPECT_TRUE(Failing(zmctest::kRenameCall, error, rename, false));
        EXPECT_FALSE(StatusOf(path).exists);
        EXPECT_EQ(zmctest::ReadText(other), "text");
        zmctest::WriteText(path, "new");
        EXPECT_FALSE(Failing(zmctest::kRenameCall, error, rename, false)) << "the name is taken";
        EXPECT_EQ(zmctest::ReadText(other), "text");
    }
}

TEST_F(FileSystemFaults, NamesFallApartAtTheirLastSlash) {
    EXPECT_EQ(FolderOf("/a/b"), "/a");
    EXPECT_EQ(FolderOf("/a"), "/");
    EXPECT_EQ(FolderOf("a"), ".");
    EXPECT_EQ(NameOf("/a/b"), "b");
    EXPECT_EQ(NameOf("b"), "b");
    EXPECT_EQ(JoinPath(".", "b"), "b");
    EXPECT_EQ(JoinPath("/", "b"), "/b");
    EXPECT_EQ(JoinPath("/a", "b"), "/a/b");
}

TEST_F(FileSystemFaults, LinksAreFollowedToTheirEnd) {
    EXPECT_EQ(ResolveLinks(path), path);
    std::filesystem::create_symlink("file", folder / "near");
    EXPECT_EQ(ResolveLinks(folder / "near"), path);
    std::filesystem::create_symlink(folder / "near", folder / "far");
    EXPECT_EQ(ResolveLinks(folder / "far"), path);
    std::filesystem::create_symlink("circle", folder / "circle");
    EXPECT_EQ(ResolveLinks(folder / "circle"), folder / "circle") << "it has no end";
}

TEST_F(FileSystemFaults, FoldersAndDisksThatAreNotThere) {
    const auto names = ListFolder(folder.String());
    EXPECT_NE(std::find(names.begin(), names.end(), "file"), names.end());
    EXPECT_TRUE(ListFolder(missing).empty());
    EXPECT_TRUE(FreeSpace(folder.String()).has_value());
    EXPECT_FALSE(FreeSpace(missing).has_value());
    EXPECT_FALSE(StatusOf(missing).exists);
    EXPECT_TRUE(StatusOf(folder.String()).isFolder);
    EXPECT_FALSE(RemoveEntry(missing));
    EXPECT_FALSE(RenameFile(missing, path));
    EXPECT_EQ(zmctest::ReadText(path), "text");
}

TEST_F(FileSystemFaults, ReadOnlyIsWhatNobodyMayWrite) {
    EXPECT_FALSE(StatusOf(path).readOnly);
    ASSERT_EQ(chmod(path.c_str(), 0444), 0);
    EXPECT_TRUE(StatusOf(path).readOnly);
}

TEST_F(FileSystemFaults, LocksTellWhyTheyFail) {
    FileLock lock;
    const auto take = [&] { return lock.Take(path); };
    EXPECT_EQ(Failing(zmctest::kOpenCall, EMFILE, take), FileLock::Result::Failed);
    EXPECT_EQ(lock.Take(missing), FileLock::Result::Missing);
    EXPECT_EQ(Failing(zmctest::kStatusCall, EIO, take), FileLock::Result::Missing)
        << "it cannot be known to be the file of that name";
    EXPECT_EQ(take(), FileLock::Result::Taken);
}

}  // namespace
}  // namespace platform
