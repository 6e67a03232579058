// The border between those who use a source and whoever wrote it: no answer gets through that
// cannot be true, and no exception.
#include "files/ByteSource.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

#include "files/MemorySource.h"
#include "files/RecordingSource.h"
#include "tests/support/FaultySource.h"
#include "tests/support/TextSource.h"

namespace zelm::files {
namespace {

using zmctest::FaultySource;
using zmctest::Holding;
using zmctest::SourceFault;

class Border : public testing::Test {
protected:
    void Misbehave(SourceFault fault, std::size_t n = 1, bool fromThenOn = true) {
        source.fault = fault;
        source.n = source.Transfers() + n;
        source.fromThenOn = fromThenOn;
    }
    std::size_t Read(std::uint64_t offset, std::size_t size) {
        std::strcpy(buffer, "..............");
        error = -1;
        return source.ReadAt(offset, buffer, size, &error);
    }
    std::size_t Write(std::uint64_t offset, const std::string& text) {
        error = -1;
        return source.WriteAt(offset, text.data(), text.size(), &error);
    }
    std::string Content() const {
        const auto bytes = memory->Content();
        return {bytes.begin(), bytes.end()};
    }

    const std::shared_ptr<MemorySource> memory = Holding("0123456789");
    FaultySource source{memory};
    char buffer[16] = {};
    int error = -1;
};

struct FailingCase {
    SourceFault fault;
    std::size_t moved;
    int error;
};

void PrintTo(const FailingCase& each, std::ostream* out) { *out << static_cast<int>(each.fault); }

class BorderFailures : public Border, public testing::WithParamInterface<FailingCase> {};

TEST_P(BorderFailures, AReadThatFailsSaysWhyAndHowFarItCame) {
    source.error = ENXIO;
    Misbehave(GetParam().fault);
    EXPECT_EQ(Read(0, 8), GetParam().moved);
    EXPECT_EQ(error, GetParam().error);
    EXPECT_EQ(std::string(buffer), std::string("0123").substr(0, GetParam().moved) +
                                       std::string(14 - GetParam().moved, '.'));
    EXPECT_EQ(source.ReadAt(0, buffer, 8), GetParam().moved) << "who does not ask is not told";
}

TEST_P(BorderFailures, AWriteThatFailsSaysWhyAndHowFarItCame) {
    source.error = ENXIO;
    Misbehave(GetParam().fault);
    EXPECT_EQ(Write(0, "abcdefgh"), GetParam().moved);
    EXPECT_EQ(error, GetParam().error);
    EXPECT_EQ(Content(), GetParam().moved == 4 ? "abcd456789" : "0123456789");
    EXPECT_EQ(source.WriteAt(0, "a", 1), 0U);
}

TEST_P(BorderFailures, OneRangeThatFailsLeavesTheOthers) {
    source.error = ENXIO;
    Misbehave(GetParam().fault, 2, false);
    // Without a reason it is asked again, and the second answer is as good as any.
    const bool mended = GetParam().fault == SourceFault::AnswersNothing;
    char second[9] = "........";
    Range ranges[] = {{0, buffer, 2, {}}, {2, second, 8, {}}, {2, buffer + 2, 2, {}}};
    EXPECT_EQ(source.ReadMany(ranges), mended);
    EXPECT_EQ(std::string(buffer), "0123");
    EXPECT_EQ(ranges[1].done.bytes, mended ? 8 : GetParam().moved);
    EXPECT_EQ(ranges[1].done.error, mended ? 0 : GetParam().error);
    EXPECT_FALSE(ranges[1].done.end);
    EXPECT_EQ(ranges[2].done.bytes, 2U);
    EXPECT_EQ(ranges[2].done.error, 0);
}

INSTANTIATE_TEST_SUITE_P(, BorderFailures,
                         testing::Values(FailingCase{SourceFault::Fails, 0, ENXIO},
                                         FailingCase{SourceFault::FailsPartway, 4, ENXIO},
                                         FailingCase{SourceFault::AnswersNothing, 0, EIO},
                                         FailingCase{SourceFault::AnswersTooMuch, 0, EIO},
                                         FailingCase{SourceFault::RunsOutOfMemory, 0, ENOMEM},
                                         FailingCase{SourceFault::Throws, 0, EIO},
                                         FailingCase{SourceFault::ThrowsANumber, 0, EIO}));

TEST_F(Border, ShortAnswersAreGoneOnWith) {
    Misbehave(SourceFault::AnswersShort);
    EXPECT_EQ(Read(1, 8), 8U);
    EXPECT_EQ(error, 0);
    EXPECT_STREQ(buffer, "12345678......");
    EXPECT_EQ(source.Transfers(), 4U) << "4, 2, 1 and 1 bytes";
    EXPECT_EQ(Write(1, "abcdefgh"), 8U);
    EXPECT_EQ(error, 0);
    EXPECT_EQ(Content(), "0abcdefgh9");
}

TEST_F(Border, AFailureBehindAShortAnswerKeepsWhatCame) {
    Misbehave(SourceFault::AnswersShort, 1, false);
    source.beforeTransfer = [this](std::size_t number) {
        if (number == 2) Misbehave(SourceFault::Fails, 0);
    };
    EXPECT_EQ(Read(0, 8), 4U);
    EXPECT_EQ(error, EIO);
    EXPECT_STREQ(buffer, "0123..........");
}

TEST_F(Border, ASizeThatIsTooLargeMakesTheEndAFailure) {
    source.claimedSize = 1000;
    EXPECT_EQ(source.Size(), 1000U);
    EXPECT_EQ(Read(8, 6), 2U);
    EXPECT_EQ(error, EIO) << "it promised more";
    EXPECT_EQ(Read(500, 6), 0U);
    EXPECT_EQ(error, EIO);
    EXPECT_EQ(Read(1000, 6), 0U);
    EXPECT_EQ(error, 0);
    EXPECT_STREQ(buffer, "..............");
}

TEST_F(Border, ASizeThatIsTooSmallHidesNothing) {
    source.claimedSize = 3;
    EXPECT_EQ(Read(0, 8), 8U);
    EXPECT_EQ(error, 0);
}

TEST_F(Border, WhoCannotTellItsSizeIsBelievedAtItsEnd) {
    source.sizeError = ESPIPE;
    EXPECT_EQ(Read(8, 6), 2U);
    EXPECT_EQ(error, 0);
    std::uint64_t size = 5;
    EXPECT_FALSE(source.TellSize(size, &error));
    EXPECT_EQ(error, ESPIPE);
    EXPECT_EQ(size, 5U) << "it stays as it was";
    EXPECT_EQ(source.Size(), ByteSource::kUnknownSize);
    source.sizeError = 0;
    source.claimedSize = ByteSource::kUnknownSize;
    EXPECT_FALSE(source.TellSize(size, &error));
    EXPECT_EQ(error, EOVERFLOW);
    EXPECT_FALSE(source.TellSize(size));
}

TEST_F(Border, ASourceThatShrinksUnderAReadEndsThere) {
    source.beforeTransfer = [this](std::size_t) { memory->Truncate(4); };
    EXPECT_EQ(Read(0, 8), 4U);
    EXPECT_EQ(error, 0);
    EXPECT_STREQ(buffer, "0123..........");
}

TEST_F(Border, StepsThatThrowFail) {
    source.othersThrow = true;
    std::uint64_t size = 5;
    EXPECT_FALSE(source.TellSize(size, &error));
    EXPECT_EQ(error, EIO);
    EXPECT_FALSE(source.Truncate(0, &(error = 0)));
    EXPECT_EQ(error, EIO);
    EXPECT_FALSE(source.Sync(&(error = 0)));
    EXPECT_EQ(error, EIO);
    EXPECT_FALSE(source.Remove(&(error = 0)));
    EXPECT_EQ(error, EIO);
    EXPECT_TRUE(source.Identify() == Identity{});
    EXPECT_FALSE(source.Truncate(0) || source.Sync() || source.Remove());
    EXPECT_EQ(Content(), "0123456789");
}

// The least that a source can be.
class Alphabet : public ByteSource {
protected:
    Transfer DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) override {
        std::size_t moved = 0;
        for (; moved < size && offset + moved < 26; ++moved)
            static_cast<char*>(buffer)[moved] = static_cast<char>('a' + offset + moved);
        return {moved};
    }
    int DoTellSize(std::uint64_t& size) const override {
        size = 26;
        return 0;
    }
};

TEST(ByteSource, NeedsNoMoreThanToBeReadAndMeasured) {
    Alphabet source;
    char buffer[5] = "....";
    int error = -1;
    EXPECT_EQ(source.ReadAt(24, buffer, 4, &error), 2U);
    EXPECT_EQ(error, 0);
    EXPECT_STREQ(buffer, "yz..");
    Range ranges[] = {{0, buffer, 2, {}}, {2, buffer + 2, 2, {}}};
    EXPECT_TRUE(source.ReadMany(ranges));
    EXPECT_STREQ(buffer, "abcd");
    EXPECT_FALSE(source.IsWritable());
    EXPECT_FALSE(source.Identify().known);
    EXPECT_TRUE(source.Sync());
    EXPECT_EQ(source.WriteAt(0, "x", 1, &error), 0U);
    EXPECT_EQ(error, EBADF);
}

// Says that it can be written, and forgets how.
class Forgetful : public Alphabet {
protected:
    bool DoIsWritable() const override {
        if (unsure) throw 1;
        return true;
    }

public:
    bool unsure = false;
};

TEST(ByteSource, WhatASourceDoesNotFillInIsNotSupported) {
    Forgetful source;
    int error = 0;
    EXPECT_EQ(source.WriteAt(0, "x", 1, &error), 0U);
    EXPECT_EQ(error, ENOTSUP);
    EXPECT_FALSE(source.Truncate(0, &(error = 0)));
    EXPECT_EQ(error, ENOTSUP);
    EXPECT_FALSE(source.Remove(&(error = 0)));
    EXPECT_EQ(error, ENOTSUP);
    source.unsure = true;
    EXPECT_FALSE(source.IsWritable());
    EXPECT_FALSE(source.Truncate(0, &(error = 0)));
    EXPECT_EQ(error, EBADF);
}

// Answers many ranges in a way of its own.
class Together : public Alphabet {
public:
    enum class Answer { Nothing, ThrowsAfterTheFirst, ShortOfAll, TooMuch, EndAndError } answer{};
    std::size_t calls = 0;

protected:
    void DoReadMany(std::span<Range> ranges) override {
        ++calls;
        if (answer == Answer::Nothing) return;
        ByteSource::DoReadMany(ranges.first(1));
        if (answer == Answer::ThrowsAfterTheFirst) throw std::bad_alloc();
        for (Range& range : ranges.subspan(1)) {
            if (answer == Answer::ShortOfAll) range.done = DoReadAt(range.offset, range.buffer, 1);
            if (answer == Answer::TooMuch) range.done = {range.size + 1};
            if (answer == Answer::EndAndError) range.done = {0, ENXIO, true};
        }
    }
};

class ManyTogether : public testing::Test {
protected:
    bool Read(Together::Answer answer) {
        source.answer = answer;
        std::strcpy(buffer, "......");
        return source.ReadMany(ranges);
    }

    Together source;
    char buffer[7] = {};
    Range ranges[2] = {{0, buffer, 3, {}}, {10, buffer + 3, 3, {}}};
};

TEST_F(ManyTogether, RangesThatAreNotAnsweredAreAskedForSingly) {
    EXPECT_TRUE(Read(Together::Answer::Nothing));
    EXPECT_STREQ(buffer, "abcklm");
    EXPECT_TRUE(Read(Together::Answer::ShortOfAll));
    EXPECT_STREQ(buffer, "abcklm");
    EXPECT_EQ(source.calls, 2U);
}

TEST_F(ManyTogether, WhatItThrowsIsTheFailureOfAllThatIsNotThere) {
    EXPECT_FALSE(Read(Together::Answer::ThrowsAfterTheFirst));
    EXPECT_STREQ(buffer, "abc...");
    EXPECT_EQ(ranges[0].done.error, 0);
    EXPECT_EQ(ranges[1].done.error, ENOMEM);
}

TEST_F(ManyTogether, AnAnswerThatCannotBeIsAFailure) {
    EXPECT_FALSE(Read(Together::Answer::TooMuch));
    EXPECT_EQ(ranges[1].done.bytes, 0U);
    EXPECT_EQ(ranges[1].done.error, EIO);
    EXPECT_FALSE(Read(Together::Answer::EndAndError));
    EXPECT_EQ(ranges[1].done.error, ENXIO);
    EXPECT_FALSE(ranges[1].done.end) << "what failed did not end";
}

TEST(Identity, TellsThingsAndStatesApart) {
    const Identity one{true, 1, 2, 30, 40, 50};
    Identity other = one;
    EXPECT_TRUE(one.SameContent(other));
    other.changed = 51;
    EXPECT_TRUE(one.SameContent(other) && one != other);
    other.modified = 41;
    EXPECT_TRUE(one.SameThing(other) && !one.SameContent(other));
    other = one;
    other.size = 31;
    EXPECT_TRUE(one.SameThing(other) && !one.SameContent(other));
    other = one;
    other.number = 3;
    EXPECT_FALSE(one.SameThing(other) || one.SameContent(other));
    other = one;
    other.volume = 3;
    EXPECT_FALSE(one.SameThing(other));
    const Identity unknown;
    EXPECT_TRUE(unknown == Identity{});
    EXPECT_FALSE(unknown.SameThing(unknown) || one.SameThing(unknown) || unknown.SameThing(one));
}

// --- what is remembered ---

class Recording : public Border {
protected:
    const std::shared_ptr<FaultySource> faulty = std::make_shared<FaultySource>(memory);
    RecordingSource recording{faulty};
};

TEST_F(Recording, SuccessLeavesNothing) {
    recording.ReadAt(0, buffer, 10);
    recording.WriteAt(0, "x", 1);
    recording.Size();
    recording.Sync();
    recording.Truncate(5);
    EXPECT_EQ(recording.Record().Failures(), 0U);
    EXPECT_EQ(recording.Record().endsMet, 0U);
    EXPECT_FALSE(recording.Record().first);
    EXPECT_EQ(recording.Source(), faulty);
}

TEST_F(Recording, KeepsTheFirstFailureAndCountsAll) {
    faulty->n = 2;
    faulty->fromThenOn = true;
    faulty->fault = SourceFault::FailsPartway;
    faulty->error = ENOSPC;
    EXPECT_EQ(recording.WriteAt(1, "ab", 2), 2U);
    EXPECT_EQ(recording.WriteAt(3, "cdef", 4), 2U);
    EXPECT_EQ(recording.WriteAt(7, "gh", 2), 1U);
    EXPECT_EQ(recording.ReadAt(0, buffer, 4), 2U);
    const FailureRecord record = recording.Record();
    EXPECT_EQ(record.writes, 2U);
    EXPECT_EQ(record.reads, 1U);
    EXPECT_EQ(record.others, 0U);
    EXPECT_EQ(record.Failures(), 3U);
    ASSERT_TRUE(record.first);
    EXPECT_EQ(record.first->operation, Operation::Write);
    EXPECT_EQ(record.first->offset, 3U);
    EXPECT_EQ(record.first->size, 4U);
    EXPECT_EQ(record.first->moved, 2U);
    EXPECT_EQ(record.first->error, ENOSPC);
}

TEST_F(Recording, TheEndIsCountedApart) {
    EXPECT_EQ(recording.ReadAt(8, buffer, 6), 2U);
    EXPECT_EQ(recording.ReadAt(20, buffer, 6), 0U);
    EXPECT_EQ(faulty->Transfers(), 4U) << "the end is looked for once, not by each of the two";
    const FailureRecord record = recording.Record();
    EXPECT_EQ(record.Failures(), 0U);
    EXPECT_EQ(record.endsMet, 2U);
    EXPECT_FALSE(record.first);
    ASSERT_TRUE(record.firstEnd);
    EXPECT_EQ(record.firstEnd->offset, 8U);
    EXPECT_EQ(record.firstEnd->size, 6U);
    EXPECT_EQ(record.firstEnd->moved, 2U);
    EXPECT_EQ(record.firstEnd->error, 0);
    faulty->claimedSize = 1000;
    recording.ReadAt(8, buffer, 6);
    EXPECT_EQ(recording.Record().reads, 1U) << "an end where none should be is a failure";
}

TEST_F(Recording, RangesAreRecordedOneByOne) {
    faulty->n = 1;
    Range ranges[] = {{0, buffer, 2, {}}, {2, buffer, 2, {}}, {9, buffer, 2, {}}};
    EXPECT_FALSE(recording.ReadMany(ranges));
    EXPECT_EQ(recording.Record().reads, 1U);
    EXPECT_EQ(recording.Record().endsMet, 1U);
    EXPECT_EQ(recording.Record().first->offset, 0U);
    EXPECT_EQ(recording.Record().firstEnd->offset, 9U);
}

TEST_F(Recording, StepsThatFailAreRecorded) {
    faulty->othersThrow = true;
    recording.Size();
    recording.Truncate(77);
    recording.Sync();
    recording.Remove();
    EXPECT_FALSE(recording.Identify().known);
    FailureRecord record = recording.Take();
    EXPECT_EQ(record.others, 4U);
    EXPECT_EQ(record.first->operation, Operation::Size);
    recording.Truncate(77);
    record = recording.Record();
    EXPECT_EQ(record.first->operation, Operation::Truncate);
    EXPECT_EQ(record.first->offset, 77U);
}

TEST_F(Recording, WhatIsRefusedBeforehandIsRecordedToo) {
    recording.ReadAt(~std::uint64_t{0}, buffer, 2);
    EXPECT_EQ(recording.Record().reads, 1U);
    EXPECT_EQ(recording.Take().first->error, EOVERFLOW);
    RecordingSource readOnly(
        std::make_shared<MemorySource>(MemorySource::Bytes(3), MemorySource::Access::ReadOnly));
    EXPECT_EQ(readOnly.WriteAt(0, "x", 1), 0U);
    EXPECT_FALSE(readOnly.Remove());
    EXPECT_EQ(readOnly.Record().writes, 1U);
    EXPECT_EQ(readOnly.Record().others, 1U);
    EXPECT_EQ(readOnly.Record().first->error, EBADF);
}

TEST_F(Recording, CanBeTakenAndForgotten) {
    faulty->n = 1;
    faulty->fromThenOn = true;
    recording.ReadAt(0, buffer, 2);
    EXPECT_EQ(recording.Take().reads, 1U);
    EXPECT_EQ(recording.Record().Failures(), 0U);
    EXPECT_FALSE(recording.Record().first);
    recording.ReadAt(5, buffer, 2);
    EXPECT_EQ(recording.Record().first->offset, 5U) << "the first since";
    recording.Reset();
    EXPECT_EQ(recording.Record().Failures(), 0U);
}

// A note that throws is nobody's failure.
class Clumsy : public Alphabet {
protected:
    void DoNote(const Failure&) const override { throw 3; }
};

TEST(ByteSource, NotesThatThrowAreDropped) {
    Clumsy source;
    char buffer[2];
    EXPECT_EQ(source.ReadAt(25, buffer, 2), 1U);
    EXPECT_FALSE(source.Remove());
}

// --- memory ---

TEST(MemorySource, StaysWithinItsLimit) {
    MemorySource source({}, MemorySource::Access::Writable, 8);
    int error = 0;
    EXPECT_EQ(source.WriteAt(0, "12345678", 8), 8U);
    EXPECT_EQ(source.WriteAt(6, "abc", 3, &error), 0U);
    EXPECT_EQ(error, ENOSPC);
    EXPECT_FALSE(source.Truncate(9, &(error = 0)));
    EXPECT_EQ(error, ENOSPC);
    EXPECT_EQ(source.Size(), 8U);
    EXPECT_EQ(source.Content().front(), '1');
}

TEST(MemorySource, BeginsWithMoreThanItMayGrowTo) {
    MemorySource source(MemorySource::Bytes(10, 'x'), MemorySource::Access::Writable, 4);
    EXPECT_EQ(source.WriteAt(8, "yy", 2), 2U) << "that needs no room";
    EXPECT_EQ(source.WriteAt(9, "zz", 2), 0U);
    EXPECT_TRUE(source.Truncate(6));
    EXPECT_EQ(source.Size(), 6U);
}

TEST(MemorySource, CannotBeRemoved) {
    MemorySource source;
    int error = 0;
    EXPECT_FALSE(source.Remove(&error));
    EXPECT_EQ(error, ENOTSUP);
}

}  // namespace
}  // namespace zelm::files
