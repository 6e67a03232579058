// What every source has to do, whatever holds its bytes and however it gives them.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <cstring>
#include <functional>
#include <memory>
#include <ostream>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "files/FileSource.h"
#include "files/Lending.h"
#include "files/MemorySource.h"
#include "files/OpenSource.h"
#include "files/RecordingSource.h"
#include "tests/support/FaultySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zelm::files {
namespace {

using SourcePtr = std::shared_ptr<ByteSource>;
using zmctest::FaultySource;
using zmctest::SourceFault;

// What a source needs while it lives.
struct World {
    zmctest::ScratchDirectory folder;
    std::vector<LentName> names;
};

struct Kind {
    const char* name;
    std::function<SourcePtr(World&)> makeEmpty;
    // The same with that content, for reading only.
    std::function<SourcePtr(World&, const std::string&)> makeReadOnly;
};

void PrintTo(const Kind& kind, std::ostream* out) { *out << kind.name; }

SourcePtr EmptyFile(World& world) {
    return FileSource::Open((world.folder / "source").c_str(), OpenMode::Create);
}

SourcePtr ReadOnlyFile(World& world, const std::string& content) {
    zmctest::WriteText(world.folder / "source", content);
    return FileSource::Open((world.folder / "source").c_str(), OpenMode::Read);
}

SourcePtr EmptyMemory(World&) { return std::make_shared<MemorySource>(); }

SourcePtr ReadOnlyMemory(World&, const std::string& content) {
    return std::make_shared<MemorySource>(MemorySource::Bytes(content.begin(), content.end()),
                                          MemorySource::Access::ReadOnly);
}

SourcePtr Recorded(SourcePtr source) { return std::make_shared<RecordingSource>(source); }

SourcePtr Lent(World& world, const SourcePtr& source, OpenMode mode) {
    world.names.push_back(Lend(source));
    return OpenSource(world.names.back().Text(), mode);
}

// Gives half of what is asked for at every transfer, and lets its caller find out why.
SourcePtr Halving(SourcePtr source) {
    const auto faulty = std::make_shared<FaultySource>(source);
    faulty->n = 1;
    faulty->fromThenOn = true;
    faulty->fault = SourceFault::AnswersShort;
    return faulty;
}

template <class Wrap>
Kind Wrapped(const char* name, Wrap wrap) {
    return {name, [wrap](World& world) { return wrap(EmptyMemory(world)); },
            [wrap](World& world, const std::string& content) {
                return wrap(ReadOnlyMemory(world, content));
            }};
}

const Kind kinds[]{
    {"File", EmptyFile, ReadOnlyFile},
    {"Memory", EmptyMemory, ReadOnlyMemory},
    {"RecordedFile", [](World& world) { return Recorded(EmptyFile(world)); },
     [](World& world, const std::string& content) {
         return Recorded(ReadOnlyFile(world, content));
     }},
    Wrapped("RecordedMemory", Recorded),
    {"LentFile", [](World& world) { return Lent(world, EmptyFile(world), OpenMode::Create); },
     [](World& world, const std::string& content) {
         return Lent(world, ReadOnlyFile(world, content), OpenMode::Read);
     }},
    Wrapped("InPieces", Halving),
    Wrapped("RecordedInPieces", [](const SourcePtr& source) { return Recorded(Halving(source)); }),
};

std::string NameOf(const testing::TestParamInfo<Kind>& instance) { return instance.param.name; }

class SourceConformance : public testing::TestWithParam<Kind> {
protected:
    SourcePtr Empty() { return GetParam().makeEmpty(world); }
    SourcePtr Filled(const std::string& content) {
        SourcePtr source = Empty();
        EXPECT_EQ(source->WriteAt(0, content.data(), content.size()), content.size());
        return source;
    }

    static std::string TextAt(ByteSource& source, std::uint64_t offset, std::size_t size) {
        std::string text(size, '#');
        int error = -1;
        text.resize(source.ReadAt(offset, text.data(), size, &error));
        EXPECT_EQ(error, 0);
        return text;
    }
    static std::string All(ByteSource& source) {
        return TextAt(source, 0, static_cast<std::size_t>(source.Size()));
    }

    World world;
};

TEST_P(SourceConformance, GivesBackWhatWasWritten) {
    const SourcePtr source = Empty();
    ASSERT_TRUE(source);
    EXPECT_TRUE(source->IsWritable());
    EXPECT_EQ(source->Size(), 0U);
    int error = -1;
    EXPECT_EQ(source->WriteAt(0, "hello world", 11, &error), 11U);
    EXPECT_EQ(error, 0);
    EXPECT_EQ(source->WriteAt(6, "W", 1), 1U);
    EXPECT_EQ(TextAt(*source, 0, 11), "hello World");
    EXPECT_EQ(TextAt(*source, 4, 3), "o W");
    error = -1;
    EXPECT_TRUE(source->Sync(&error));
    EXPECT_EQ(error, 0);
}

TEST_P(SourceConformance, TellsItsSize) {
    const SourcePtr source = Filled("abc");
    EXPECT_EQ(source->Size(), 3U);
    std::uint64_t size = 0;
    int error = -1;
    EXPECT_TRUE(source->TellSize(size, &error));
    EXPECT_EQ(size, 3U);
    EXPECT_EQ(error, 0);
    EXPECT_TRUE(source->TellSize(size));
}

TEST_P(SourceConformance, AReadThatMeetsTheEndIsShortAndNoFailure) {
    const SourcePtr source = Filled("abc");
    char buffer[] = "......";
    int error = -1;
    EXPECT_EQ(source->ReadAt(1, buffer, 5, &error), 2U);
    EXPECT_EQ(error, 0);
    EXPECT_STREQ(buffer, "bc....") << "the rest stays as it was";
    for (const std::uint64_t offset :
         {std::uint64_t{3}, std::uint64_t{1000}, std::uint64_t{1} << 62, std::uint64_t{1} << 63}) {
        EXPECT_EQ(source->ReadAt(offset, buffer, 5, &(error = -1)), 0U) << offset;
        EXPECT_EQ(error, 0) << offset;
    }
    EXPECT_STREQ(buffer, "bc....");
}

TEST_P(SourceConformance, TransfersOfNothingSucceed) {
    const SourcePtr source = Filled("abc");
    for (const std::uint64_t offset : {std::uint64_t{0}, std::uint64_t{5}, ~std::uint64_t{0}}) {
        int error = -1;
        EXPECT_EQ(source->ReadAt(offset, nullptr, 0, &error), 0U);
        EXPECT_EQ(error, 0);
        EXPECT_EQ(source->WriteAt(offset, nullptr, 0, &(error = -1)), 0U);
        EXPECT_EQ(error, 0);
    }
    EXPECT_EQ(All(*source), "abc");
}

TEST_P(SourceConformance, RangesThatOverflowAreRefused) {
    const SourcePtr source = Filled("abc");
    char buffer[] = "....";
    for (const std::uint64_t offset : {~std::uint64_t{0}, ~std::uint64_t{0} - 2}) {
        int error = 0;
        EXPECT_EQ(source->ReadAt(offset, buffer, 4, &error), 0U);
        EXPECT_EQ(error, EOVERFLOW);
        EXPECT_EQ(source->WriteAt(offset, buffer, 4, &(error = 0)), 0U);
        EXPECT_EQ(error, EOVERFLOW);
    }
    EXPECT_EQ(source->ReadAt(1, buffer, ~std::size_t{0}), 0U);
    EXPECT_STREQ(buffer, "....");
    EXPECT_EQ(All(*source), "abc");
}

TEST_P(SourceConformance, WritesFarBeyondWhatCanBeAreRefused) {
    const SourcePtr source = Filled("abc");
    int error = 0;
    EXPECT_EQ(source->WriteAt(std::uint64_t{1} << 63, "x", 1, &error), 0U);
    EXPECT_NE(error, 0);
    EXPECT_FALSE(source->Truncate(std::uint64_t{1} << 63, &(error = 0)));
    EXPECT_NE(error, 0);
    EXPECT_EQ(All(*source), "abc");
}

TEST_P(SourceConformance, GrowsWithZerosInBetween) {
    const SourcePtr source = Filled("ab");
    EXPECT_EQ(source->WriteAt(5, "f", 1), 1U);
    EXPECT_EQ(All(*source), std::string("ab\0\0\0f", 6));
}

TEST_P(SourceConformance, EndsWhereItIsCut) {
    const SourcePtr source = Filled("abcdef");
    int error = -1;
    EXPECT_TRUE(source->Truncate(2, &error));
    EXPECT_EQ(error, 0);
    EXPECT_EQ(All(*source), "ab");
    EXPECT_TRUE(source->Truncate(4));
    EXPECT_EQ(All(*source), std::string("ab\0\0", 4));
}

TEST_P(SourceConformance, ReadsManyRangesAsItReadsOne) {
    const SourcePtr source = Filled("0123456789");
    std::array<std::string, 5> texts;
    std::vector<Range> ranges;
    const std::pair<std::uint64_t, std::size_t> wanted[] = {
        {7, 3}, {2, 4}, {4, 4}, {8, 4}, {99, 4}};
    for (std::size_t i = 0; i < texts.size(); ++i) {
        texts[i].assign(wanted[i].second, '#');
        ranges.push_back({wanted[i].first, texts[i].data(), wanted[i].second, {}});
    }
    ranges[0].done = {77, EIO, true};  // of an earlier call
    EXPECT_FALSE(source->ReadMany(ranges)) << "the last two meet the end";
    EXPECT_EQ(texts, (std::array<std::string, 5>{"789", "2345", "4567", "89##", "####"}));
    for (std::size_t i = 0; i < texts.size(); ++i) {
        SCOPED_TRACE(i);
        EXPECT_EQ(ranges[i].done.error, 0);
        EXPECT_EQ(ranges[i].done.end, i > 2);
        EXPECT_EQ(ranges[i].offset, wanted[i].first);
        EXPECT_EQ(ranges[i].buffer, texts[i].data());
        EXPECT_EQ(ranges[i].size, wanted[i].second);
    }
    EXPECT_EQ(ranges[2].done.bytes, 4U);
    EXPECT_EQ(ranges[3].done.bytes, 2U);
    EXPECT_EQ(ranges[4].done.bytes, 0U);
    EXPECT_TRUE(source->ReadMany(std::span(ranges).first(3)));
    EXPECT_TRUE(source->ReadMany({}));
}

TEST_P(SourceConformance, ARangeOutOfOrderDoesNotSpoilTheOthers) {
    const SourcePtr source = Filled("0123456789");
    char first[4] = {}, second[4] = {};
    Range ranges[] = {{1, first, 3, {}},
                      {~std::uint64_t{0} - 1, second, 3, {}},
                      {0, nullptr, 0, {}},
                      {5, second, 3, {}}};
    EXPECT_FALSE(source->ReadMany(ranges));
    EXPECT_EQ(ranges[1].done.error, EOVERFLOW);
    EXPECT_EQ(ranges[1].done.bytes, 0U);
    EXPECT_FALSE(ranges[1].done.end);
    EXPECT_STREQ(first, "123");
    EXPECT_STREQ(second, "567");
    EXPECT_EQ(ranges[2].done.error, 0);
}

TEST_P(SourceConformance, IsItselfAndShowsItsChanges) {
    const SourcePtr source = Filled("abc");
    const Identity before = source->Identify();
    EXPECT_TRUE(before.known);
    EXPECT_TRUE(source->Identify() == before);
    EXPECT_TRUE(source->Identify().SameContent(before));
    source->WriteAt(3, "d", 1);
    const Identity after = source->Identify();
    EXPECT_TRUE(after.SameThing(before));
    EXPECT_FALSE(after.SameContent(before));
    EXPECT_FALSE(after == before);
    World elsewhere;
    const SourcePtr other = GetParam().makeEmpty(elsewhere);
    EXPECT_FALSE(other->Identify().SameThing(after));
}

TEST_P(SourceConformance, ForReadingOnlyItChangesNothing) {
    const SourcePtr source = GetParam().makeReadOnly(world, "abc");
    ASSERT_TRUE(source);
    EXPECT_FALSE(source->IsWritable());
    int error = 0;
    EXPECT_EQ(source->WriteAt(0, "x", 1, &error), 0U);
    EXPECT_EQ(error, EBADF);
    EXPECT_FALSE(source->Truncate(0, &(error = 0)));
    EXPECT_EQ(error, EBADF);
    EXPECT_FALSE(source->Remove(&(error = 0)));
    EXPECT_EQ(error, EBADF);
    EXPECT_TRUE(source->Sync());
    EXPECT_EQ(All(*source), "abc");
}

// Any order of operations, against a text that the same is done to.
TEST_P(SourceConformance, DoesWhatATextDoes) {
    const SourcePtr source = Empty();
    std::string model;
    std::mt19937 random(7);
    const auto below = [&](std::size_t limit) { return std::size_t{random()} % limit; };
    for (int step = 0; step < 400; ++step) {
        const std::size_t offset = below(300), size = below(60);
        switch (below(4)) {
            case 0: {
                const std::string text(size, static_cast<char>('a' + step % 26));
                ASSERT_EQ(source->WriteAt(offset, text.data(), size), size);
                if (size == 0) break;
                if (model.size() < offset + size) model.resize(offset + size);
                model.replace(offset, size, text);
                break;
            }
            case 1:
                if (step % 8 != 0) break;
                ASSERT_TRUE(source->Truncate(offset));
                model.resize(offset);
                break;
            default:
                ASSERT_EQ(TextAt(*source, offset, size),
                          offset < model.size() ? model.substr(offset, size) : "");
        }
        ASSERT_EQ(source->Size(), model.size());
    }
    EXPECT_EQ(All(*source), model);
}

TEST_P(SourceConformance, ThreadsReadAtOnce) {
    std::string content(20000, ' ');
    for (std::size_t i = 0; i < content.size(); ++i) content[i] = static_cast<char>('a' + i % 23);
    const SourcePtr source = Filled(content);
    std::atomic<int> wrong{0};
    std::vector<std::thread> threads;
    for (unsigned seed = 0; seed < 4; ++seed)
        threads.emplace_back([&, seed] {
            std::mt19937 random(seed);
            for (int i = 0; i < 100; ++i) {
                char one[100], other[100];
                const std::size_t at = random() % 19900, second = random() % 19900;
                Range ranges[] = {{at, one, 100, {}}, {second, other, 100, {}}};
                const bool right =
                    source->ReadMany(ranges) && std::memcmp(one, content.data() + at, 100) == 0 &&
                    std::memcmp(other, content.data() + second, 100) == 0 &&
                    source->ReadAt(second, one, 100) == 100 && std::memcmp(one, other, 100) == 0 &&
                    source->Size() == content.size() && source->Identify().known;
                if (!right) ++wrong;
            }
        });
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(wrong, 0);
}

INSTANTIATE_TEST_SUITE_P(, SourceConformance, testing::ValuesIn(kinds), NameOf);

}  // namespace
}  // namespace zelm::files
