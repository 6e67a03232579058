// The recorder of what a process does to a folder, and the disk that loses power meanwhile.
#include "tests/support/DiskModel.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <set>

#include "platform/File.h"
#include "platform/FileSystem.h"
#include "tests/support/ChildProcess.h"
#include "tests/support/ScratchDirectory.h"

namespace zmctest {
namespace {

using Kind = DiskStep::Kind;
using testing::ElementsAre;

DiskStep Bytes(std::uint64_t offset, const std::string& bytes) {
    return {Kind::Bytes, 1, offset, bytes, {}};
}
DiskStep Size(std::uint64_t size) { return {Kind::Size, 1, size, "", {}}; }
DiskStep Names(const std::vector<std::string>& names) {
    DiskStep step{Kind::Names, 0, 0, "", {}};
    for (const std::string& name : names) step.names[name] = 1;
    return step;
}
DiskStep FlushFile() { return {Kind::FlushFile, 1, 0, "", {}}; }
DiskStep FlushFolder() { return {Kind::FlushFolder, 0, 0, "", {}}; }

// A file "a" with those bytes, and then those steps.
DiskModel Model(const std::string& bytes, const std::vector<DiskStep>& more) {
    std::vector<DiskStep> steps = {Size(bytes.size()), Bytes(0, bytes), Names({"a"}), FlushFile(),
                                   FlushFolder()};
    steps.insert(steps.end(), more.begin(), more.end());
    return DiskModel(steps);
}

std::set<std::string> Contents(const DiskModel& model, const DiskEffort& effort = {}) {
    std::set<std::string> found;
    model.Visit(effort, [&](const DiskState& state) {
        for (const auto& [name, number] : state.names)
            found.insert(name + '=' + state.files.at(number) + (state.atEnd ? "." : ""));
        return true;
    });
    return found;
}

TEST(DiskModel, BetweenFlushesAnySubsetIsThere) {
    const DiskModel model =
        Model("----", {Bytes(0, "B"), Bytes(2, "C"), FlushFile(), Bytes(3, "D"), FlushFile()});
    EXPECT_THAT(Contents(model),
                ElementsAre("a=----", "a=--C-", "a=B---", "a=B-C-", "a=B-CD", "a=B-CD."));
    EXPECT_EQ(Contents(model.Without({7})).count("a=---D"), 1u);
    EXPECT_THAT(model.Flushes(), ElementsAre(7, 9));
}

TEST(DiskModel, ManyChangesAreTakenOneByOne) {
    const DiskModel model =
        Model("---", {Bytes(0, "B"), Bytes(1, "C"), Bytes(2, "D"), FlushFile()});
    EXPECT_THAT(Contents(model, {0, 0}), ElementsAre("a=---", "a=--D", "a=-C-", "a=-CD", "a=B--",
                                                     "a=B-D", "a=BC-", "a=BCD", "a=BCD."));
}

TEST(DiskModel, SizesAreChangesOfTheirOwn) {
    EXPECT_THAT(Contents(Model("-", {Size(2), Bytes(1, "B"), FlushFile()})),
                ElementsAre("a=-", std::string("a=-\0", 4), "a=-B", "a=-B."));
    EXPECT_THAT(Contents(Model("--", {Size(1), FlushFile()})), ElementsAre("a=-", "a=--", "a=-."));
}

TEST(DiskModel, NamesAreMissingFromTheLast) {
    EXPECT_THAT(Contents(Model("-", {Names({"b"}), Names({"c"}), FlushFolder()})),
                ElementsAre("a=-", "b=-", "c=-", "c=-."));
    EXPECT_EQ(Contents(Model("-", {Names({}), FlushFolder()})).size(), 1u);
}

TEST(DiskModel, SectorsAndPagesAreTorn) {
    const std::string before(8192 + 512, '-'), after(8192, 'B');
    const std::set<std::string> found =
        Contents(Model(before, {Bytes(256, after), FlushFile()}), {8, 50});
    const auto with = [&](std::size_t from, std::size_t to) {
        std::string bytes = before;
        std::fill(bytes.begin() + static_cast<std::ptrdiff_t>(from),
                  bytes.begin() + static_cast<std::ptrdiff_t>(to), 'B');
        return "a=" + bytes;
    };
    for (const auto& [from, to] : {std::pair<std::size_t, std::size_t>{256, 512},
                                   {512, 8448},
                                   {256, 8192},
                                   {8192, 8448},
                                   {256, 4096},
                                   {4096, 8448}})
        EXPECT_EQ(found.count(with(from, to)), 1u) << from << " to " << to;
    EXPECT_GT(found.size(), 30u);
}

TEST(DiskRecording, TellsWhatWasDone) {
    const ScratchDirectory folder, elsewhere;
    const std::string name = folder / "a", log = elsewhere / "log";
    WriteText(name, "before");
    const std::uint64_t number = platform::StatusOf(name).number;
    {
        const DiskRecording recording(folder.String(), log);
        const auto file = platform::File::Open(std::u16string(name.begin(), name.end()).c_str(),
                                               platform::File::Mode::Update);
        file->WriteAt(4, "REST of it", 10);
        file->Sync();
        platform::RenameFile(name, folder / "b");
        platform::SyncFolder(folder.String());
        file->Truncate(3);
    }
    std::string told;
    for (const DiskStep& step : DiskRecording::Read(log)) {
        EXPECT_TRUE(step.file == number || step.file == 0);
        told += static_cast<char>(step.kind) + std::to_string(step.offset) + step.bytes;
        for (const auto& [each, of] : step.names) told += each;
        told += ' ';
    }
    EXPECT_EQ(told, "S6 B0before N0a F0 D0 S14 B4REST of it F0 N0b D0 S3 ");
}

TEST(DiskRecording, ProgramsAreRecordedAndSeeAnotherRunOfTheSystem) {
    const ScratchDirectory folder, elsewhere;
    const std::string log = elsewhere / "log";
    const ChildResult result = RunChild(
        {"/bin/dd", "if=/proc/sys/kernel/random/boot_id", "of=" + (folder / "copy"), "status=none"},
        DiskRecording::ForChild(folder.String(), log));
    ASSERT_EQ(result.status, 0) << result.err;
    const auto steps = DiskRecording::Read(log);
    ASSERT_FALSE(steps.empty());
    EXPECT_NE(ReadText(folder / "copy"), platform::SystemRun() + '\n');
    EXPECT_EQ(Contents(DiskModel(steps)).count("copy=" + ReadText(folder / "copy") + '.'), 1u);
}

}  // namespace
}  // namespace zmctest
