// Plain files as sources: what they stay, whatever happens to their names, and what they tell of
// the disk.
#include "files/FileSource.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <memory>
#include <string>

#include "files/Lending.h"
#include "files/OpenSource.h"
#include "tests/support/FileFaults.h"
#include "tests/support/ScratchDirectory.h"

namespace zelm::files {
namespace {

using zmctest::FileFault;
using zmctest::FileFaultAction;
using zmctest::FileFaults;
using zmctest::ReadText;
using zmctest::WriteText;

class FileSourceTest : public testing::Test {
protected:
    FileSourceTest() { WriteText(path, "first"); }

    std::shared_ptr<FileSource> Open(OpenMode mode = OpenMode::Update) {
        return FileSource::Open(path.c_str(), mode);
    }
    static std::string TextOf(ByteSource& source) {
        std::string text(32, '#');
        text.resize(source.ReadAt(0, text.data(), text.size()));
        return text;
    }
    FileFault Fault(unsigned calls, int number, FileFaultAction action = FileFaultAction::Error) {
        return {folder.String(), calls, 1, true, action, number};
    }

    zmctest::ScratchDirectory folder;
    const std::string path = folder / "file";
    int error = -1;
};

TEST_F(FileSourceTest, OpensAsItIsAsked) {
    EXPECT_TRUE(FileSource::Open(path.c_str(), OpenMode::Read, &error));
    EXPECT_EQ(error, 0);
    EXPECT_FALSE(Open(OpenMode::Read)->IsWritable());
    const auto updated = Open(OpenMode::Update);
    EXPECT_TRUE(updated->IsWritable());
    EXPECT_EQ(TextOf(*updated), "first");
    EXPECT_TRUE(String(updated->Name()) == path.c_str());
    EXPECT_TRUE(Open(OpenMode::Create)->IsWritable());
    EXPECT_EQ(TextOf(*updated), "") << "emptied by the last";
}

TEST_F(FileSourceTest, TellsWhyItDoesNotOpen) {
    const std::string missing = folder / "missing";
    for (const OpenMode mode : {OpenMode::Update, OpenMode::Read}) {
        EXPECT_FALSE(FileSource::Open(missing.c_str(), mode, &(error = 0)));
        EXPECT_EQ(error, ENOENT);
        EXPECT_FALSE(FileSource::Open(folder.String().c_str(), mode, &(error = 0)));
        EXPECT_EQ(error, EISDIR);
    }
    EXPECT_FALSE(FileSource::Open(missing.c_str(), OpenMode::Read)) << "who does not ask";
    EXPECT_FALSE(FileSource::Open(String(), OpenMode::Create, &(error = 0)));
    EXPECT_EQ(error, EINVAL) << "no name";
    EXPECT_FALSE(FileSource::Open("/dev/null", OpenMode::Read, &(error = 0)));
    EXPECT_EQ(error, EINVAL) << "no regular file";
    EXPECT_FALSE(std::filesystem::exists(missing));
}

TEST_F(FileSourceTest, StaysTheFileThatWasOpenedWhenAnotherTakesItsName) {
    const auto source = Open();
    const Identity before = source->Identify();
    EXPECT_TRUE(source->NameStillMeansThis());
    EXPECT_TRUE(source->IdentifyName() == before);
    WriteText(folder / "other", "second and longer");
    std::filesystem::rename(folder / "other", path);
    EXPECT_EQ(TextOf(*source), "first");
    EXPECT_FALSE(source->NameStillMeansThis());
    EXPECT_TRUE(source->IdentifyName().known);
    EXPECT_TRUE(FileSource::IdentifyName(String(source->Name())) == source->IdentifyName());
    EXPECT_FALSE(FileSource::IdentifyName(String("")).known);
    EXPECT_TRUE(source->Identify().SameContent(before)) << "the open one is as it was";
    EXPECT_EQ(TextOf(*Open()), "second and longer");
}

TEST_F(FileSourceTest, StaysWhenItIsRenamedOrRemoved) {
    const auto source = Open();
    std::filesystem::rename(path, folder / "elsewhere");
    EXPECT_FALSE(source->NameStillMeansThis());
    EXPECT_FALSE(source->IdentifyName().known);
    EXPECT_EQ(source->WriteAt(0, "F", 1), 1U);
    EXPECT_EQ(ReadText(folder / "elsewhere"), "First");
    std::filesystem::remove(folder / "elsewhere");
    EXPECT_EQ(TextOf(*source), "First");
}

TEST_F(FileSourceTest, ShowsThatItWasCutOrRewritten) {
    const auto source = Open(OpenMode::Read);
    const Identity before = source->Identify();
    std::filesystem::resize_file(path, 2);
    EXPECT_TRUE(source->NameStillMeansThis());
    EXPECT_TRUE(source->Identify().SameThing(before));
    EXPECT_FALSE(source->Identify().SameContent(before));
    EXPECT_EQ(source->Identify().size, 2U);
    std::filesystem::resize_file(path, 5);
    struct timespec later[2] = {{5, 0}, {5, 0}};
    ASSERT_EQ(utimensat(AT_FDCWD, path.c_str(), later, 0), 0);
    EXPECT_FALSE(source->Identify().SameContent(before)) << "same size, other time";
    EXPECT_EQ(source->Identify().modified, 5'000'000'000);
}

TEST_F(FileSourceTest, TwoSourcesOfOneFileAreOneThing) {
    std::filesystem::create_symlink("file", folder / "link");
    const auto one = Open();
    const auto other = FileSource::Open((folder / "link").c_str(), OpenMode::Read);
    EXPECT_TRUE(one->Identify() == other->Identify());
    EXPECT_TRUE(other->NameStillMeansThis()) << "through the link";
}

TEST_F(FileSourceTest, RemovesItsName) {
    const auto source = Open();
    EXPECT_TRUE(source->Remove(&error));
    EXPECT_EQ(error, 0);
    EXPECT_FALSE(std::filesystem::exists(path));
    EXPECT_EQ(TextOf(*source), "first") << "it is still open";
    EXPECT_FALSE(source->Remove(&error));
    EXPECT_EQ(error, ESTALE);
}

TEST_F(FileSourceTest, DoesNotRemoveWhatTookItsName) {
    const auto source = Open();
    WriteText(folder / "other", "second");
    std::filesystem::rename(folder / "other", path);
    EXPECT_FALSE(source->Remove(&error));
    EXPECT_EQ(error, ESTALE);
    EXPECT_EQ(ReadText(path), "second");
}

TEST_F(FileSourceTest, TellsWhatTheDiskSays) {
    const auto source = Open();
    char buffer[4];
    std::uint64_t size = 0;
    {
        FileFaults faults(Fault(zmctest::kAnyCall, EIO));
        EXPECT_EQ(source->ReadAt(0, buffer, 4, &error), 0U);
        EXPECT_EQ(error, EIO);
        EXPECT_FALSE(source->TellSize(size, &(error = 0)));
        EXPECT_EQ(error, EIO);
        EXPECT_FALSE(source->Sync(&(error = 0)));
        EXPECT_EQ(error, EIO);
        EXPECT_FALSE(source->Identify().known);
        EXPECT_FALSE(source->NameStillMeansThis());
        EXPECT_FALSE(FileSource::Open(path.c_str(), OpenMode::Read, &(error = 0)));
        EXPECT_EQ(error, EIO);
    }
    FileFaults faults(Fault(zmctest::kChangingCall, ENOSPC));
    EXPECT_EQ(source->WriteAt(0, "abcd", 4, &(error = 0)), 0U);
    EXPECT_EQ(error, ENOSPC);
    EXPECT_FALSE(source->Truncate(9, &(error = 0)));
    EXPECT_EQ(error, ENOSPC);
    EXPECT_FALSE(source->Remove(&(error = 0)));
    EXPECT_EQ(error, ENOSPC);
    EXPECT_EQ(TextOf(*source), "first");
}

TEST_F(FileSourceTest, AWriteThatTheDiskDropsIsAFailure) {
    const auto source = Open();
    FileFaults faults(Fault(zmctest::kWriteCall, 0, FileFaultAction::Nothing));
    EXPECT_EQ(source->WriteAt(0, "abcd", 4, &error), 0U);
    EXPECT_EQ(error, EIO);
}

// A process that begins with some of the standard streams closed.
class WithoutStreams : public FileSourceTest {
protected:
    // Runs `work` in a child without the streams from `first` on; its result, or -1.
    template <class Work>
    static int InChild(int first, Work&& work) {
        const pid_t child = fork();
        if (child == 0) {
            for (int stream = first; stream < 3; ++stream) close(stream);
            _exit(work());
        }
        int status = 0;
        if (waitpid(child, &status, 0) != child || !WIFEXITED(status)) return -1;
        return WEXITSTATUS(status);
    }
    // Whether any of them is open, or takes a message.
    static bool AnyStream(int first) {
        for (int stream = first; stream < 3; ++stream)
            if (write(stream, "message", 7) >= 0 || lseek(stream, 0, SEEK_CUR) >= 0) return true;
        return false;
    }
};

TEST_F(WithoutStreams, NoFileTakesTheirPlace) {
    for (const int first : {0, 1, 2})
        for (const OpenMode mode : {OpenMode::Create, OpenMode::Update, OpenMode::Read}) {
            WriteText(path, "first");
            EXPECT_EQ(InChild(first,
                              [&] {
                                  const auto source = Open(mode);
                                  const auto another = Open(mode);
                                  if (!source || !another) return 1;
                                  if (AnyStream(first)) return 2;
                                  char byte;
                                  if (mode == OpenMode::Create) source->WriteAt(0, "f", 1);
                                  return source->ReadAt(0, &byte, 1) == 1 && byte == 'f' ? 0 : 3;
                              }),
                      0)
                << first << ", mode " << static_cast<int>(mode);
            EXPECT_EQ(ReadText(path), mode == OpenMode::Create ? "f" : "first");
        }
}

TEST_F(WithoutStreams, WithNoOtherPlaceAFileDoesNotOpen) {
    // A sanitizer opens files of its own when it first looks at a class, and waits for a place.
    ASSERT_TRUE(FileSource::Open(path.c_str(), OpenMode::Read));
    EXPECT_EQ(InChild(2,
                      [&] {
                          struct rlimit limit = {3, 3};
                          if (setrlimit(RLIMIT_NOFILE, &limit) != 0) return 1;
                          int failure = 0;
                          if (FileSource::Open(path.c_str(), OpenMode::Read, &failure)) return 2;
                          return failure != 0 && !AnyStream(2) ? 0 : 3;
                      }),
              0);
}

// --- names of all kinds ---

TEST_F(FileSourceTest, OpenSourceTakesAPlainNameAsTheFile) {
    EXPECT_EQ(TextOf(*OpenSource(path.c_str(), OpenMode::Read)), "first");
    EXPECT_TRUE(OpenSource(path.c_str(), OpenMode::Update)->IsWritable());
    const auto made = OpenSource((folder / "made").c_str(), OpenMode::Create, &error);
    ASSERT_TRUE(made);
    EXPECT_EQ(error, 0);
    EXPECT_TRUE(std::filesystem::exists(folder / "made"));
    EXPECT_FALSE(OpenSource((folder / "missing").c_str(), OpenMode::Read, &error));
    EXPECT_EQ(error, ENOENT);
    EXPECT_FALSE(OpenSource(String(), OpenMode::Read));
}

TEST_F(FileSourceTest, ANameThatLooksLentNeverMeansAFile) {
    const auto home = std::filesystem::current_path();
    std::filesystem::current_path(folder.String());
    const LentName name = Lend(Open());
    const std::string good = name.Utf8();
    const std::string names[] = {"zmc-lent:", "zmc-lent:plain", good + "0",
                                 good.substr(0, good.size() - 1)};
    for (const std::string& each : names) {
        WriteText(each, "a file");
        for (const OpenMode mode : {OpenMode::Create, OpenMode::Update, OpenMode::Read}) {
            EXPECT_FALSE(OpenSource(each.c_str(), mode, &(error = 0))) << each;
            EXPECT_EQ(error, ENOENT);
        }
        EXPECT_EQ(ReadText(each), "a file");
    }
    EXPECT_TRUE(OpenSource(("./" + names[1]).c_str(), OpenMode::Read)) << "that is a file's name";
    WriteText(good, "a file");
    EXPECT_EQ(TextOf(*OpenSource(name.Text(), OpenMode::Read)), "first");
    std::filesystem::current_path(home);
}

TEST_F(FileSourceTest, RemoveSourceRemovesWhatANameStandsFor) {
    EXPECT_TRUE(RemoveSource(path.c_str(), &error));
    EXPECT_EQ(error, 0);
    EXPECT_FALSE(std::filesystem::exists(path));
    EXPECT_FALSE(RemoveSource(path.c_str(), &error));
    EXPECT_EQ(error, ENOENT);
    WriteText(path, "first");
    LentName name = Lend(Open(OpenMode::Read));
    EXPECT_FALSE(RemoveSource(name.Text(), &error)) << "not writable";
    EXPECT_EQ(error, EBADF);
    name = Lend(Open());
    EXPECT_TRUE(RemoveSource(name.Text(), &error));
    EXPECT_FALSE(std::filesystem::exists(path));
    EXPECT_TRUE(FindLent(name.Text())) << "what is open goes on";
    const std::string gone = name.Utf8();
    name.Withdraw();
    EXPECT_FALSE(RemoveSource(gone.c_str(), &error));
    EXPECT_EQ(error, ENOENT);
    EXPECT_FALSE(RemoveSource(gone.c_str()));
}

}  // namespace
}  // namespace zelm::files
