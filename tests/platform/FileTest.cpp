#include "platform/File.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <filesystem>
#include <string>
#include <vector>

#include "platform/FileLock.h"
#include "platform/FileSystem.h"
#include "platform/Rights.h"

namespace platform {
namespace {

// A directory of its own for every test, removed afterwards.
class FileTest : public testing::Test {
protected:
    FileTest() {
        std::string pattern = (std::filesystem::temp_directory_path() / "zmcfileXXXXXX").string();
        directory = mkdtemp(pattern.data());
    }
    ~FileTest() override { std::filesystem::remove_all(directory); }

    std::u16string Name(const char* leaf) const { return (directory / leaf).u16string(); }

    std::filesystem::path directory;
};

TEST_F(FileTest, CreatesWritesAndReadsBack) {
    const auto name = Name("a.bin");
    const auto file = File::Open(name.c_str(), File::Mode::Create);
    ASSERT_TRUE(file);
    EXPECT_EQ(file->Size(), 0u);
    EXPECT_EQ(file->WriteAt(3, "hello", 5), 5u);
    EXPECT_EQ(file->Size(), 8u);
    char buffer[9] = "........";
    EXPECT_EQ(file->ReadAt(0, buffer, 8), 8u);
    EXPECT_EQ(std::string(buffer, 8), std::string("\0\0\0hello", 8));
    EXPECT_TRUE(file->Sync());
}

TEST_F(FileTest, ShortReadLeavesTheRestOfTheBuffer) {
    const auto name = Name("a.bin");
    const auto file = File::Open(name.c_str(), File::Mode::Create);
    ASSERT_TRUE(file);
    file->WriteAt(0, "abc", 3);
    char buffer[6] = "xxxxx";
    EXPECT_EQ(file->ReadAt(1, buffer, 5), 2u);
    EXPECT_STREQ(buffer, "bcxxx");
    EXPECT_EQ(file->ReadAt(100, buffer, 5), 0u);
    EXPECT_STREQ(buffer, "bcxxx");
}

TEST_F(FileTest, TruncatesAndGrows) {
    const auto name = Name("a.bin");
    const auto file = File::Open(name.c_str(), File::Mode::Create);
    file->WriteAt(0, "abcdef", 6);
    EXPECT_TRUE(file->Truncate(2));
    EXPECT_EQ(file->Size(), 2u);
    EXPECT_TRUE(file->Truncate(4));
    char buffer[4] = {'x', 'x', 'x', 'x'};
    EXPECT_EQ(file->ReadAt(0, buffer, 4), 4u);
    EXPECT_EQ(std::string(buffer, 4), std::string("ab\0\0", 4));
    EXPECT_FALSE(file->Truncate(~std::uint64_t{0}));
    EXPECT_FALSE(File::Open(name.c_str(), File::Mode::Read)->Truncate(0));
    EXPECT_EQ(file->Size(), 4u);
}

TEST_F(FileTest, CreateEmptiesAndUpdateKeeps) {
    const auto name = Name("a.bin");
    File::Open(name.c_str(), File::Mode::Create)->WriteAt(0, "abc", 3);
    EXPECT_EQ(File::Open(name.c_str(), File::Mode::Update)->Size(), 3u);
    EXPECT_EQ(File::Open(name.c_str(), File::Mode::Create)->Size(), 0u);
}

TEST_F(FileTest, UpdateAndReadDoNotMakeFiles) {
    const auto name = Name("missing");
    EXPECT_FALSE(File::Open(name.c_str(), File::Mode::Update));
    EXPECT_FALSE(File::Open(name.c_str(), File::Mode::Read));
    EXPECT_FALSE(std::filesystem::exists(directory / "missing"));
}

TEST_F(FileTest, ReadModeDoesNotWrite) {
    const auto name = Name("a.bin");
    File::Open(name.c_str(), File::Mode::Create)->WriteAt(0, "abc", 3);
    const auto file = File::Open(name.c_str(), File::Mode::Read);
    ASSERT_TRUE(file);
    EXPECT_EQ(file->WriteAt(0, "x", 1), 0u);
    EXPECT_EQ(file->Size(), 3u);
}

TEST_F(FileTest, DirectoriesPipesAndDevicesAreRefusedAtOnce) {
    const auto pipe = Name("pipe");
    ASSERT_EQ(mkfifo((directory / "pipe").c_str(), 0600), 0);
    for (const auto mode : {File::Mode::Create, File::Mode::Update, File::Mode::Read}) {
        EXPECT_FALSE(File::Open(directory.u16string().c_str(), mode));
        EXPECT_FALSE(File::Open(pipe.c_str(), mode));
        EXPECT_FALSE(File::Open(u"/dev/null", mode));
    }
}

TEST_F(FileTest, NoNameOpensNothing) {
    EXPECT_FALSE(File::Open(nullptr, File::Mode::Read));
    EXPECT_FALSE(File::Open(u"", File::Mode::Create));
    EXPECT_FALSE(RemoveFile(nullptr));
}

TEST_F(FileTest, NamesOutsideAsciiAreUtf8) {
    const std::u16string name = directory.u16string() + u"/Stra\u00dfe \u5730\u56fe \U0001F5FA.pyr";
    ASSERT_TRUE(File::Open(name.c_str(), File::Mode::Create));
    EXPECT_EQ(access((directory / u8"Stra\u00dfe \u5730\u56fe \U0001F5FA.pyr").c_str(), F_OK), 0);
    EXPECT_TRUE(RemoveFile(name.c_str()));
    EXPECT_FALSE(RemoveFile(name.c_str()));
}

TEST_F(FileTest, MovesBytesBeyondFourGigabytes) {
    const auto name = Name("big.bin");
    const auto file = File::Open(name.c_str(), File::Mode::Create);
    ASSERT_TRUE(file);
    const std::uint64_t far = (std::uint64_t{5} << 30) + 7;
    EXPECT_EQ(file->WriteAt(far, "end", 3), 3u);
    EXPECT_EQ(file->Size(), far + 3);
    char buffer[4] = {};
    EXPECT_EQ(file->ReadAt(far, buffer, 3), 3u);
    EXPECT_STREQ(buffer, "end");
}

TEST_F(FileTest, OffsetsBeyondTheSystemsRangeMoveNothing) {
    const auto name = Name("a.bin");
    const auto file = File::Open(name.c_str(), File::Mode::Create);
    ASSERT_TRUE(file);
    char byte = 'x';
    for (const std::uint64_t offset : {std::uint64_t{1} << 63, ~std::uint64_t{0}}) {
        EXPECT_EQ(file->WriteAt(offset, &byte, 1), 0u);
        EXPECT_EQ(file->ReadAt(offset, &byte, 1), 0u);
    }
    EXPECT_EQ(file->WriteAt((std::uint64_t{1} << 63) - 1, &byte, 1), 0u);
    EXPECT_EQ(file->Size(), 0u);
}

TEST_F(FileTest, ChildrenDoNotInheritTheHandle) {
    const int before = open("/dev/null", O_RDONLY | O_CLOEXEC);
    close(before);  // the lowest free number, which the next open takes
    const auto name = Name("a.bin");
    const auto file = File::Open(name.c_str(), File::Mode::Create);
    ASSERT_TRUE(file);
    const int flags = fcntl(before, F_GETFD);
    ASSERT_GE(flags, 0);
    EXPECT_NE(flags & FD_CLOEXEC, 0);
}

TEST_F(FileTest, OperationsTellWhyTheyFailed) {
    const auto name = Name("a.bin");
    int error = -1;
    EXPECT_FALSE(File::Open(name.c_str(), File::Mode::Read, &error));
    EXPECT_EQ(error, ENOENT);
    EXPECT_FALSE(File::Open(nullptr, File::Mode::Read, &error));
    EXPECT_EQ(error, EINVAL);
    const auto file = File::Open(name.c_str(), File::Mode::Create, &error);
    ASSERT_TRUE(file);
    EXPECT_EQ(error, 0);
    char byte = 'x';
    EXPECT_EQ(file->WriteAt(~std::uint64_t{0}, &byte, 1, &error), 0u);
    EXPECT_EQ(error, EFBIG);
    EXPECT_EQ(file->WriteAt(0, &byte, 1, &error), 1u);
    EXPECT_EQ(error, 0);
    EXPECT_EQ(file->ReadAt(1, &byte, 1, &(error = -1)), 0u);
    EXPECT_EQ(error, 0) << "the end is no failure";
    EXPECT_FALSE(file->Truncate(~std::uint64_t{0}, &error));
    EXPECT_EQ(error, EFBIG);
    EXPECT_TRUE(file->Sync(&error) && error == 0);
    const auto readOnly = File::Open(name.c_str(), File::Mode::Read);
    EXPECT_EQ(readOnly->WriteAt(0, &byte, 1, &error), 0u);
    EXPECT_EQ(error, EBADF);
    EXPECT_TRUE(RemoveFile(name.c_str(), &error) && error == 0);
    EXPECT_FALSE(RemoveFile(name.c_str(), &error));
    EXPECT_EQ(error, ENOENT);
    EXPECT_FALSE(RemoveFile(nullptr, &error));
    EXPECT_EQ(error, EINVAL);
}

TEST_F(FileTest, IdentityGoesWithTheFileAndNotWithItsName) {
    const auto name = Name("a.bin"), other = Name("b.bin");
    const auto file = File::Open(name.c_str(), File::Mode::Create);
    FileIdentity open, named;
    ASSERT_TRUE(file->TellIdentity(open) && TellIdentity(name.c_str(), named));
    EXPECT_EQ(open.device, named.device);
    EXPECT_EQ(open.number, named.number);
    EXPECT_EQ(open.modified, named.modified);
    EXPECT_EQ(open.changed, named.changed);
    EXPECT_GT(open.modified, std::int64_t{1'500'000'000'000'000'000}) << "nanoseconds since 1970";
    file->WriteAt(0, "abc", 3);
    ASSERT_TRUE(file->TellIdentity(open));
    EXPECT_EQ(open.size, 3u);
    std::filesystem::rename(name, other);
    EXPECT_FALSE(TellIdentity(name.c_str(), named));
    EXPECT_TRUE(TellIdentity(other.c_str(), named));
    EXPECT_EQ(open.number, named.number);
    EXPECT_FALSE(TellIdentity(nullptr, named));
}

TEST_F(FileTest, LocksAndFilesOpenForAMomentKeepOffTheStandardStreams) {
    const std::string path = (directory / "lock").string();
    ASSERT_TRUE(CreateNewFile(path));
    const int input = fcntl(0, F_DUPFD_CLOEXEC, 3);
    ASSERT_GE(input, 3);
    close(0);
    const auto isFree = [] { return fcntl(0, F_GETFD) < 0; };
    FileLock lock;
    const bool taken = lock.Take(path) == FileLock::Result::Taken && isFree();
    const bool served = SyncFile(path) && ReserveSpace(path, 10) && isFree();
    const auto wide = Name("lock");
    const bool opened = File::Open(wide.c_str(), File::Mode::Update) && isFree();
    dup2(input, 0);
    close(input);
    EXPECT_TRUE(taken && served && opened) << taken << served << opened;
}

TEST_F(FileTest, LockHasOneHolder) {
    const std::string path = (directory / "lock").string();
    FileLock first, second;
    EXPECT_EQ(first.Take(path), FileLock::Result::Missing);
    ASSERT_TRUE(CreateNewFile(path));
    EXPECT_EQ(first.Take(path), FileLock::Result::Taken);
    EXPECT_EQ(second.Take(path), FileLock::Result::Held);
    std::filesystem::rename(path, path + "2");
    EXPECT_EQ(second.Take(path), FileLock::Result::Missing);
    EXPECT_EQ(second.Take(path + "2"), FileLock::Result::Held) << "it goes with the file";
    first.Release();
    EXPECT_EQ(second.Take(path + "2"), FileLock::Result::Taken);
}

TEST_F(FileTest, ThoseWhoLookShareALock) {
    const std::string path = (directory / "lock").string();
    ASSERT_TRUE(CreateNewFile(path));
    FileLock first, second, alone;
    EXPECT_EQ(first.Take(path, FileLock::Kind::Shared), FileLock::Result::Taken);
    EXPECT_EQ(second.Take(path, FileLock::Kind::Shared), FileLock::Result::Taken);
    EXPECT_EQ(alone.Take(path), FileLock::Result::Held);
    first.Release();
    second.Release();
    EXPECT_EQ(alone.Take(path), FileLock::Result::Taken);
    EXPECT_EQ(second.Take(path, FileLock::Kind::Shared), FileLock::Result::Held);
}

TEST_F(FileTest, LockIsOfARegularFileUnderItsOwnName) {
    const std::string path = (directory / "file").string();
    ASSERT_TRUE(CreateNewFile(path));
    const std::string link = (directory / "link").string();
    std::filesystem::create_symlink(path, link);
    const std::string fifo = (directory / "pipe").string();
    ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
    for (const auto kind : {FileLock::Kind::Alone, FileLock::Kind::Shared})
        for (const std::string& name : {link, fifo, directory.string()}) {
            FileLock lock;
            EXPECT_EQ(lock.Take(name, kind), FileLock::Result::Failed) << name;
            EXPECT_NE(errno, 0);
            EXPECT_FALSE(lock.Status().exists);
        }
}

TEST_F(FileTest, FileThatIsLockedIsReadWhateverTakesItsName) {
    const std::string path = (directory / "lock").string();
    ASSERT_TRUE(CreateNewFile(path));
    const auto file = File::Open(Name("lock").c_str(), File::Mode::Update);
    ASSERT_EQ(file->WriteAt(0, "text", 4), 4u);
    FileLock lock;
    ASSERT_EQ(lock.Take(path), FileLock::Result::Taken);
    std::filesystem::rename(path, path + "2");
    ASSERT_TRUE(CreateNewFile(path));
    char text[8] = {};
    EXPECT_EQ(lock.ReadAt(1, text, sizeof text), 3u);
    EXPECT_STREQ(text, "ext");
    EXPECT_EQ(lock.Status().size, 4u);
    EXPECT_EQ(lock.Status().number, StatusOf(path + "2").number);
    EXPECT_EQ(lock.Status().owner, geteuid());
    lock.Release();
    EXPECT_EQ(lock.ReadAt(0, text, sizeof text), 0u);
}

TEST_F(FileTest, AFileHasSeveralNamesWhereNoneIsTaken) {
    const std::string path = (directory / "a").string();
    ASSERT_TRUE(CreateNewFile(path));
    EXPECT_TRUE(LinkFile(path, path + "2"));
    EXPECT_EQ(StatusOf(path).number, StatusOf(path + "2").number);
    EXPECT_FALSE(LinkFile(path, path + "2"));
}

TEST(MaySpeakFor, IsTrueOfTheOwnerTheSuperuserAndOurselves) {
    FileStatus note, file;
    file.owner = 70001;
    for (const std::uint64_t owner :
         {std::uint64_t{70001}, std::uint64_t{0}, std::uint64_t{geteuid()}}) {
        note.owner = owner;
        EXPECT_TRUE(MaySpeakFor(note, file)) << owner;
    }
    note.owner = 70002;
    EXPECT_FALSE(MaySpeakFor(note, file));
}

mode_t ModeOf(const std::string& path) {
    struct stat info {};
    return stat(path.c_str(), &info) == 0 ? info.st_mode & 07777 : 0;
}

TEST_F(FileTest, RightsGoFromOneFileToAnother) {
    const std::string from = (directory / "from").string(), to = (directory / "to").string();
    ASSERT_TRUE(CreateNewFile(from) && CreateNewFile(to));
    EXPECT_TRUE(MakePrivate(to));
    EXPECT_EQ(ModeOf(to), 0600u);
    ASSERT_EQ(chmod(from.c_str(), 0646), 0);
    EXPECT_TRUE(CopyRights(from, to));
    EXPECT_EQ(ModeOf(to), 0646u);
    EXPECT_FALSE(CopyRights((directory / "none").string(), to));
    EXPECT_FALSE(CopyRights(from, (directory / "none").string()));
}

// Whoever may write the folder can put another file under the name meanwhile.
TEST_F(FileTest, RightsAreGivenToNoFileOfOthers) {
    const std::string from = (directory / "from").string(), other = (directory / "other").string();
    ASSERT_TRUE(CreateNewFile(from) && CreateNewFile(other));
    ASSERT_EQ(chmod(from.c_str(), 0666), 0);
    ASSERT_EQ(chmod(other.c_str(), 0600), 0);
    const std::string link = (directory / "link").string(), name = (directory / "name").string();
    std::filesystem::create_symlink(other, link);
    EXPECT_FALSE(CopyRights(from, link));
    EXPECT_FALSE(MakePrivate(link));
    ASSERT_TRUE(LinkFile(other, name));
    EXPECT_FALSE(CopyRights(from, name));
    EXPECT_FALSE(CopyRights(from, directory.string()));
    EXPECT_EQ(ModeOf(other), 0600u);
}

TEST_F(FileTest, LockGoesWithItsProcess) {
    const std::string path = (directory / "lock").string();
    ASSERT_TRUE(CreateNewFile(path));
    int taken[2];
    ASSERT_EQ(pipe(taken), 0);
    const pid_t child = fork();
    if (child == 0) {
        FileLock lock;
        const char result = lock.Take(path) == FileLock::Result::Taken ? 'y' : 'n';
        if (write(taken[1], &result, 1) == 1) pause();
        _exit(0);
    }
    char result = 0;
    EXPECT_EQ(read(taken[0], &result, 1), 1);
    EXPECT_EQ(result, 'y');
    FileLock lock;
    EXPECT_EQ(lock.Take(path), FileLock::Result::Held);
    kill(child, SIGKILL);
    waitpid(child, nullptr, 0);
    EXPECT_EQ(lock.Take(path), FileLock::Result::Taken);
    close(taken[0]);
    close(taken[1]);
}

TEST_F(FileTest, NewNamesReplaceNothing) {
    const std::string from = (directory / "from").string();
    const std::string to = (directory / "to").string();
    ASSERT_TRUE(CreateNewFile(from));
    EXPECT_TRUE(RenameToNewName(from, to));
    EXPECT_FALSE(StatusOf(from).exists);
    ASSERT_TRUE(CreateNewFile(from));
    EXPECT_FALSE(RenameToNewName(from, to));
    EXPECT_TRUE(StatusOf(from).exists);
    EXPECT_NE(StatusOf(from).number, StatusOf(to).number);
}

TEST_F(FileTest, RunOfTheSystemStaysTheSame) { EXPECT_EQ(SystemRun(), SystemRun()); }

}  // namespace
}  // namespace platform
