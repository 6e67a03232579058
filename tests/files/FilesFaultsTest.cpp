// Memory that runs out: nothing is half done, and what is left works on.
#include <gtest/gtest.h>

#include <cerrno>
#include <memory>
#include <string>

#include "files/FileSource.h"
#include "files/Lending.h"
#include "files/MemorySource.h"
#include "files/OpenSource.h"
#include "files/RecordingSource.h"
#include "tests/support/AllocationFaults.h"
#include "tests/support/ScratchDirectory.h"

namespace zelm::files {
namespace {

using zmctest::AllocationFaults;
using zmctest::ForEachAllocationFailing;

TEST(FilesFaults, AFileDoesNotOpenWithoutMemoryAndSaysSo) {
    const zmctest::ScratchDirectory folder;
    const std::string path = folder / "file";
    const String name(path.c_str());
    std::size_t opened = 0;
    const auto points = ForEachAllocationFailing([&](AllocationFaults& faults) {
        faults.Disarm();
        zmctest::WriteText(path, "text");
        faults.Rearm();
        int error = -1;
        const auto source = OpenSource(name, OpenMode::Create, &error);
        faults.Disarm();
        EXPECT_EQ(error, source ? 0 : ENOMEM);
        EXPECT_EQ(zmctest::ReadText(path), source ? "" : "text") << "or it stays as it was";
        if (source) ++opened;
    });
    EXPECT_GE(points, 4U) << "the source, its name, the narrow name, the file, what counts users";
    EXPECT_EQ(opened, 2U) << "once in each mode";
}

TEST(FilesFaults, NothingIsLentWithoutMemory) {
    const auto source = std::make_shared<MemorySource>();
    { const LentName first = Lend(source); }
    std::size_t lent = 0;
    const auto points = ForEachAllocationFailing([&](AllocationFaults& faults) {
        const LentName name = Lend(source);
        faults.Disarm();
        EXPECT_EQ(FindLent(name.Text()) == source, static_cast<bool>(name));
        EXPECT_EQ(source.use_count(), name ? 2 : 1);
        if (name) ++lent;
    });
    EXPECT_GE(points, 1U);
    EXPECT_GE(lent, 2U);
    EXPECT_EQ(source.use_count(), 1);
}

TEST(FilesFaults, ASourceThatCannotGrowStaysAsItIs) {
    MemorySource source(MemorySource::Bytes(4, 'x'));
    int writeError = 0, cutError = 0;
    {
        AllocationFaults faults(1, zmctest::FaultMode::FromThenOn);
        source.WriteAt(1000, "a", 1, &writeError);
        source.Truncate(1000, &cutError);
    }
    EXPECT_EQ(writeError, ENOMEM);
    EXPECT_EQ(cutError, ENOMEM);
    EXPECT_EQ(source.Content(), MemorySource::Bytes(4, 'x'));
}

// Nothing needs memory once it is open.
TEST(FilesFaults, TransfersAndRecordsTakeNoMemory) {
    const zmctest::ScratchDirectory folder;
    const auto file = FileSource::Open((folder / "file").c_str(), OpenMode::Create);
    ASSERT_TRUE(file);
    RecordingSource recording(file);
    char buffer[8] = {};
    AllocationFaults faults(0);
    recording.WriteAt(0, "abcd", 4);
    Range ranges[] = {{0, buffer, 2, {}}, {2, buffer, 8, {}}};
    recording.ReadMany(ranges);
    recording.ReadAt(~std::uint64_t{0}, buffer, 8);
    recording.Identify();
    recording.Take();
    faults.Disarm();
    EXPECT_EQ(faults.Count(), 0U);
}

}  // namespace
}  // namespace zelm::files
