// What a build leaves behind when it does not come to its end.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <rapidcheck.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <stdexcept>

#include "host/build/BuildFile.h"
#include "host/build/PartFolder.h"
#include "host/build/PyramidBuilder.h"
#include "host/build/TileStore.h"
#include "host/raster/Raster.h"
#include "platform/FileLock.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

using zmctest::MemorySource;
using zmctest::ScratchDirectory;
using zmctest::TestModule;

std::vector<std::string> NamesIn(const std::string& folder) {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(folder))
        names.push_back(entry.path().filename().string());
    std::sort(names.begin(), names.end());
    return names;
}

std::size_t ThreadsOfProcess() {
    const std::filesystem::directory_iterator tasks("/proc/self/task");
    return static_cast<std::size_t>(std::distance(begin(tasks), end(tasks)));
}

BuildOptions Overwriting() {
    BuildOptions options;
    options.overwrite = true;
    options.threads = 2;
    return options;
}

class BuildSafety : public testing::Test {
protected:
    BuildSafety() : source(900, 1300, 2), target(folder / "old.zmc") {
        source.FillWithNoise(3);
        zmctest::WriteText(target, "the old file");
    }

    void ExpectNothingChanged() {
        EXPECT_EQ(zmctest::ReadText(target), "the old file");
        EXPECT_THAT(NamesIn(folder.String()), testing::ElementsAre("old.zmc"));
    }

    std::string FailureOf(const std::string& file, const BuildOptions& options) {
        try {
            builder.Build(source, file, options);
            return "no failure";
        } catch (const Error& error) {
            return error.what();
        }
    }

    ScratchDirectory folder;
    PyramidBuilder builder{TestModule()};
    MemorySource<unsigned short> source;
    std::string target;
};

TEST_F(BuildSafety, CancellingAtAnyMomentLeavesTheOldFile) {
    for (std::uint64_t moment = 0; moment < 6; ++moment) {
        BuildOptions options = Overwriting();
        options.progress = [moment, calls = std::uint64_t{0}](const BuildProgress&) mutable {
            return calls++ < moment;
        };
        EXPECT_THROW(builder.Build(source, target, options), Cancelled) << moment;
        ExpectNothingChanged();
    }
}

TEST_F(BuildSafety, ProgressEndsAtItsTotal) {
    BuildOptions options = Overwriting();
    BuildProgress last;
    options.progress = [&](const BuildProgress& now) {
        EXPECT_GT(now.done, last.done);
        last = now;
        return true;
    };
    builder.Build(source, target, options);
    EXPECT_EQ(last.done, last.total);
}

TEST_F(BuildSafety, SourceThatThrowsLeavesTheOldFile) {
    for (const std::uint32_t line : {0u, 256u, 1280u}) {
        source.beforeRead = [line](const Window& window) {
            if (window.y == line) throw std::runtime_error("the tape is torn");
        };
        EXPECT_THROW(builder.Build(source, target, Overwriting()), std::runtime_error) << line;
        ExpectNothingChanged();
    }
}

TEST_F(BuildSafety, TargetThatExistsIsKeptUnlessToldOtherwise) {
    EXPECT_THAT(FailureOf(target, {}), testing::HasSubstr("exists already"));
    ExpectNothingChanged();
    builder.Build(source, target, Overwriting());
    EXPECT_TRUE(Raster::Open(TestModule(), target).IsComplete());
}

TEST_F(BuildSafety, TargetThatIsFolderIsRefused) {
    EXPECT_THAT(FailureOf(folder.String(), Overwriting()), testing::HasSubstr("it is a folder"));
    EXPECT_THAT(FailureOf(folder.String() + "/", Overwriting()), testing::HasSubstr("no file"));
    ExpectNothingChanged();
}

TEST_F(BuildSafety, TargetThatIsReadOnlyIsRefused) {
    chmod(target.c_str(), 0444);
    EXPECT_THAT(FailureOf(target, Overwriting()), testing::HasSubstr("is read-only"));
    ExpectNothingChanged();
}

TEST_F(BuildSafety, TargetInMissingFolderIsRefused) {
    EXPECT_THAT(FailureOf(folder / "no/such.zmc", {}), testing::HasSubstr("No such file"));
    ExpectNothingChanged();
}

TEST_F(BuildSafety, LinkKeepsLeadingToItsFile) {
    std::filesystem::create_symlink("old.zmc", folder / "link");
    builder.Build(source, folder / "link", Overwriting());
    EXPECT_TRUE(std::filesystem::is_symlink(folder / "link"));
    EXPECT_TRUE(Raster::Open(TestModule(), target).IsComplete());
}

TEST_F(BuildSafety, NameThatIsNotTextIsRefused) {
    EXPECT_THAT(FailureOf(folder / "\xff\xfe.zmc", {}), testing::HasSubstr("not valid UTF-8"));
    ExpectNothingChanged();
}

TEST_F(BuildSafety, LongNameIsBuiltAsWell) {
    const std::string name(250, 'n');
    builder.Build(source, folder / name, {});
    EXPECT_THAT(NamesIn(folder.String()), testing::ElementsAre(name, "old.zmc"));
}

TEST_F(BuildSafety, NoThreadStaysBehind) {
    const std::size_t before = ThreadsOfProcess();
    BuildOptions options = Overwriting();
    options.threads = 4;
    builder.Build(source, target, options);
    EXPECT_EQ(ThreadsOfProcess(), before);
    options.progress = [](const BuildProgress&) { return false; };
    EXPECT_THROW(builder.Build(source, target, options), Cancelled);
    EXPECT_EQ(ThreadsOfProcess(), before);
}

TEST_F(BuildSafety, KilledBuildLeavesNameThatTheNextOneRemoves) {
    const pid_t child = fork();
    if (child == 0) {
        BuildOptions options = Overwriting();
        options.progress = [](const BuildProgress&) { return raise(SIGKILL) == 0; };
        builder.Build(source, target, options);
        _exit(0);
    }
    int status = 0;
    waitpid(child, &status, 0);
    ASSERT_TRUE(WIFSIGNALED(status));
    EXPECT_EQ(zmctest::ReadText(target), "the old file");
    const auto names = NamesIn(folder.String());
    ASSERT_EQ(names.size(), 2u);
    EXPECT_THAT(names[0], testing::StartsWith(".old.zmc.zmcbuild-" + std::to_string(child) + "-"));
    EXPECT_THAT(names[0], testing::EndsWith(".tmp"));
    builder.Build(source, target, Overwriting());
    EXPECT_THAT(NamesIn(folder.String()), testing::ElementsAre("old.zmc"));
}

// A number of a process tells nothing: it may be one of another container, or used again.
TEST_F(BuildSafety, OnlyLeavingsThatNobodyHoldsAreRemoved) {
    const std::string alive = std::to_string(getppid()), dead = "99999999";
    const std::vector<std::string> stale = {".old.zmc.zmcbuild-" + alive + "-1.tmp",
                                            ".old.zmc.zmcbuild-" + dead + "-1.tmp"};
    const std::vector<std::string> kept = {
        ".old.zmc.zmcbuild-" + dead + "-2.tmp",   ".old.zmc.zmcbuild-" + dead + ".tmp",
        ".old.zmc.zmcbuild-" + dead + "-1.txt",   ".old.zmc.zmcbuild-" + dead + "-1.tmp.txt",
        ".other.zmc.zmcbuild-" + dead + "-1.tmp", "old.zmc.zmcbuild-" + dead + "-1.tmp"};
    for (const auto* const names : {&stale, &kept})
        for (const std::string& name : *names) zmctest::WriteText(folder / name, "");
    platform::FileLock lock;
    ASSERT_EQ(lock.Take(folder / kept[0]), platform::FileLock::Result::Taken);
    builder.Build(source, target, Overwriting());
    const auto names = NamesIn(folder.String());
    for (const std::string& name : stale) EXPECT_THAT(names, testing::Not(testing::Contains(name)));
    for (const std::string& name : kept) EXPECT_THAT(names, testing::Contains(name));
}

TEST_F(BuildSafety, CompanionsOfFilesThatAreGoneGoToo) {
    const std::string gone = ".old.zmc.zmcbuild-99999999-5.tmp";
    const std::string there = ".old.zmc.zmcplan-99999999-6.tmp";
    for (const std::string& owner : {gone, there}) {
        for (const char* const ending : {".plan", ".new"})
            zmctest::WriteText(folder / (owner + ending), "");
        const PartFolder records(folder / (owner + ".parts"), 1);
        records.Make();
        records.Keep(PartFolder::Kind::Part, 3, {});
    }
    zmctest::WriteText(folder / there, "");
    builder.Build(source, target, Overwriting());
    EXPECT_THAT(NamesIn(folder.String()),
                testing::UnorderedElementsAre("old.zmc", there, there + ".plan", there + ".new",
                                              there + ".parts"));
}

TEST_F(BuildSafety, FileUnderConstructionIsHeld) {
    BuildOptions options = Overwriting();
    std::size_t held = 0;
    options.beforeNaming = [&](const std::string& path) {
        platform::FileLock lock;
        held += lock.Take(path) == platform::FileLock::Result::Held;
        EXPECT_EQ(zmctest::ReadText(target), "the old file");
    };
    builder.Build(source, target, options);
    EXPECT_EQ(held, 1u);
    platform::FileLock lock;
    EXPECT_EQ(lock.Take(target), platform::FileLock::Result::Taken) << "and not any longer";
}

TEST_F(BuildSafety, WhatIsThrownBeforeNamingLeavesTheOldFile) {
    BuildOptions options = Overwriting();
    options.beforeNaming = [](const std::string&) {
        throw std::runtime_error("no room beside it");
    };
    EXPECT_THROW(builder.Build(source, target, options), std::runtime_error);
    ExpectNothingChanged();
}

TEST_F(BuildSafety, FullDiskIsSeenBeforeTheBuild) {
    std::filesystem::create_directory(folder / "disk");
    zmctest::SmallDisk disk(folder / "disk", "size=2m");
    if (!disk.IsMounted()) GTEST_SKIP() << "mounting a small disk takes the superuser";
    zmctest::WriteText(folder / "disk/old.zmc", "the old file");
    EXPECT_THAT(FailureOf(folder / "disk/old.zmc", Overwriting()),
                testing::HasSubstr("of disk space"));
    EXPECT_EQ(zmctest::ReadText(folder / "disk/old.zmc"), "the old file");
    EXPECT_THAT(NamesIn(folder / "disk"), testing::ElementsAre("old.zmc"));
}

TEST_F(BuildSafety, DiskThatFillsUpMeanwhileDoesNotMatter) {
    std::filesystem::create_directory(folder / "disk");
    zmctest::SmallDisk disk(folder / "disk", "size=9m");
    if (!disk.IsMounted()) GTEST_SKIP() << "mounting a small disk takes the superuser";
    source.beforeRead = [&](const Window& window) {
        if (window.y == 256) disk.Fill();
    };
    builder.Build(source, folder / "disk/new.zmc", Overwriting());
    Raster raster = Raster::Open(TestModule(), folder / "disk/new.zmc");
    EXPECT_EQ(raster.Read<unsigned short>(0, {0, 0, 900, 1300}), source.pixels);
}

TEST_F(BuildSafety, ReadOnlyDiskIsRefused) {
    std::filesystem::create_directory(folder / "disk");
    zmctest::SmallDisk disk(folder / "disk", "size=9m");
    if (!disk.IsMounted()) GTEST_SKIP() << "mounting a small disk takes the superuser";
    ASSERT_TRUE(disk.MakeReadOnly());
    EXPECT_THAT(FailureOf(folder / "disk/new.zmc", {}), testing::HasSubstr("Read-only"));
}

// A module that answers true on a disk that takes no tile, or gives none.
class FailingWork : public PixelWork {
public:
    bool NeedsMasks() const override { return false; }
    bool MarkRow(const std::byte*, unsigned char*, std::uint32_t) const override { return false; }
    bool MayMark() const override { return false; }
    void ReduceRow(const RowWindow&, std::uint32_t, std::byte*, unsigned char*) const override {}
    void TakeStatistics(std::uint32_t, const std::byte*, const unsigned char*,
                        std::uint32_t) override {}
    bool NeedsSecondWalk() const override { return false; }
    void BeginSecondWalk() override {}
    std::string SaveSums() override { return ""; }
    void ClearSums() override {}
    bool MergeSums(std::string_view) override { return false; }
    std::string SaveCounts() override { return ""; }
    bool MergeCounts(std::string_view) override { return false; }
    void ClearCounts() override {}
    void TakeCounts(std::uint32_t, const std::byte*, const unsigned char*, std::uint32_t) override {
    }
    bool ReadTile(std::uint32_t, const Window&, std::byte*) override { return answer; }
    bool WriteTile(std::uint32_t, const Window&, std::byte*, unsigned char*) override {
        return answer;
    }
    std::string Failure() override { return failure; }
    std::vector<FullStatistics> StoreStatistics() override { return {}; }
    std::uint64_t StatisticsMemory() const override { return 0; }

    bool answer = true;
    std::string failure;
};

TEST(TileStore, TellsWhatTheDiskSaidBehindAnAnswerOfTrue) {
    FailingWork work;
    MemoryMeter meter;
    TileStore store({"x", 256, 256, 0, 1, 1}, work, meter);
    Strip strip(meter, 0, 65536, 1, 0, 256);
    strip.Begin(0, 256, 256);
    std::vector<std::byte> pixels(65536);
    const auto failures = [&] {
        std::vector<std::string> found;
        const auto note = [&](auto&& action) {
            try {
                action();
            } catch (const Error& error) {
                found.push_back(error.what());
            }
        };
        note([&] { store.Write(strip, 0, 0, 256); });
        note([&] { store.Read(0, {0, 0, 256, 256}, pixels.data()); });
        note([&] { store.ReadTile(0, {0, 0, 256, 256}, pixels.data()); });
        return found;
    };
    EXPECT_THAT(failures(), testing::IsEmpty());
    work.failure = "the disk is full";
    EXPECT_THAT(failures(), testing::ElementsAre("x: cannot write a tile: the disk is full",
                                                 "x: cannot read a tile back: the disk is full",
                                                 "x: cannot read a tile back: the disk is full"));
    work.failure.clear();
    work.answer = false;
    EXPECT_THAT(failures(), testing::SizeIs(3));
}

}  // namespace
}  // namespace zmchost
