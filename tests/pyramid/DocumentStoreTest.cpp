#include "pyramid/DocumentStore.h"

#include <gtest/gtest.h>

#include <functional>
#include <random>
#include <string>
#include <utility>
#include <vector>
#include <xercesc/framework/MemBufInputSource.hpp>

#include "pyramid/PyramidXMLDocument.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {

using namespace zelm;
namespace {

constexpr std::uint64_t kOffset = 40;  // of the documents: they stand behind something

// A file in memory that remembers every change, and whose calls can fail.
class RecordedFile {
public:
    struct Change {
        bool cut = false;  // the file ends at `offset`; else `data` is written there
        std::uint64_t offset = 0;
        std::string data;
    };

    explicit RecordedFile(std::string content) : bytes(std::move(content)) {}

    bool TellSize(std::uint64_t& size) {
        if (Allow(1) == 0) return false;
        size = bytes.size();
        return true;
    }
    std::size_t ReadAt(std::uint64_t offset, void* buffer, std::size_t size) {
        const std::size_t there = offset < bytes.size() ? bytes.size() - offset : 0;
        const std::size_t count = Allow(std::min(size, there));
        std::copy_n(bytes.data() + (count ? offset : 0), count, static_cast<char*>(buffer));
        return count;
    }
    std::size_t WriteAt(std::uint64_t offset, const void* buffer, std::size_t size) {
        const std::size_t count = Allow(size);
        const Change change{false, offset, std::string(static_cast<const char*>(buffer), count)};
        Apply(bytes, change, count);
        if (count != 0) changes.push_back(change);
        return count;
    }
    bool Truncate(std::uint64_t size) {
        if (Allow(1) == 0 || cutsFail) return false;
        changes.push_back({true, size, ""});
        Apply(bytes, changes.back(), 1);
        return true;
    }

    // The first `count` bytes of a change.
    static void Apply(std::string& bytes, const Change& change, std::size_t count) {
        if (change.cut) {
            if (count != 0) bytes.resize(change.offset);
            return;
        }
        if (count == 0) return;
        if (bytes.size() < change.offset + count) bytes.resize(change.offset + count);
        bytes.replace(change.offset, count, change.data, 0, count);
    }

    std::string bytes;
    std::vector<Change> changes;
    int calls = 0;
    bool cutsFail = false;
    // What a call may move at most, by its number from 0 and the size asked for.
    std::function<std::size_t(int, std::size_t)> limit;

private:
    std::size_t Allow(std::size_t size) {
        const int call = calls++;
        return limit ? std::min(size, limit(call, size)) : size;
    }
};

bool Store(RecordedFile& file, const std::string& text) {
    return DocumentStore<RecordedFile>(file, kOffset)
        .Write(reinterpret_cast<const unsigned char*>(text.data()), text.size());
}

std::string DocumentIn(const std::string& bytes) {
    return bytes.size() > kOffset ? bytes.substr(kOffset) : "";
}

bool IsWellFormed(const std::string& text) {
    const xercesc::MemBufInputSource source(reinterpret_cast<const XMLByte*>(text.data()),
                                            text.size(), "test");
    PyramidXMLDocument document;
    return document.ParseTree(source);
}

std::string Trimmed(std::string text) {
    while (!text.empty() && text.back() == '\n') text.pop_back();
    return text;
}

std::string Record(int band, int mean) {
    return "<BANDSTATISTICS><RSTC_BAND>" + std::to_string(band) + "</RSTC_BAND><RSTC_MEAN>" +
           std::to_string(mean) + "</RSTC_MEAN></BANDSTATISTICS>";
}

std::string Document(const std::string& between, std::initializer_list<std::string> records) {
    std::string text =
        "<?xml version=\"1.0\" encoding=\"UTF-8\" ?>" + between + "<DATASET>" + between;
    for (const std::string& record : records) text += record + between;
    return text + "</DATASET>" + between;
}

struct Case {
    const char* what;
    std::string before;  // the file
    std::string text;    // the document to store
};

std::vector<Case> Cases() {
    const std::string front(kOffset, 'p');
    const std::string text = Document("\n", {Record(0, 1), Record(1, 2)});
    // Records of one length at the same places, under the same end: any tear of these two would be
    // well-formed.
    const std::string other = Document("\n", {Record(0, 7), Record(1, 8)});
    const std::string utf16 = [] {
        std::string wide = "\xFF\xFE";
        for (const char c : Document("\n", {Record(0, 7)})) wide += {c, '\0'};
        return wide;
    }();
    return {
        {"no document", front, text},
        {"an unfinished file", front.substr(0, 25), text},
        {"a shorter document", front + Document("\n", {Record(0, 7)}), text},
        {"a document of the same length", front + other, text},
        {"one padded by its writer", front + Document("\n\n\n\n\n", {Record(0, 7)}), text},
        {"one with text in one line", front + Document("", {Record(0, 7), Record(1, 8)}), text},
        {"a longer document", front + Document(std::string(70, ' '), {Record(0, 7)}), text},
        {"one with line ends behind it", front + other + std::string(900, '\n'), text},
        {"a document in UTF-16", front + utf16, text},
        {"a long one of several blocks", front + Document(std::string(400, '\n'), {Record(0, 7)}),
         Document(std::string(500, ' '), {Record(0, 1), Record(1, 2)})}};
}

// Old, new or refused; and in front of it nothing changes.
void ExpectNoMixture(const Case& c, const std::string& after, const std::string& state) {
    const std::size_t front = std::min<std::size_t>(kOffset, c.before.size());
    ASSERT_EQ(state.substr(0, front), c.before.substr(0, front));
    const std::string text = DocumentIn(state);
    const std::string trimmed = Trimmed(text);
    if (trimmed == Trimmed(DocumentIn(c.before)) || trimmed == Trimmed(DocumentIn(after))) return;
    ASSERT_FALSE(IsWellFormed(text)) << text;
}

TEST(DocumentStoreTest, EndsAsAPlainOverwriteWould) {
    for (const Case& c : Cases()) {
        SCOPED_TRACE(c.what);
        RecordedFile file(c.before);
        ASSERT_TRUE(Store(file, c.text));
        std::string expected = c.before;
        RecordedFile::Apply(expected, {false, kOffset, c.text}, c.text.size());
        std::fill(expected.begin() + static_cast<std::ptrdiff_t>(kOffset + c.text.size()),
                  expected.end(), '\n');
        EXPECT_EQ(file.bytes, expected);
    }
}

TEST(DocumentStoreTest, EveryPrefixOfEveryWriteIsOldOrNewOrRefused) {
    for (const Case& c : Cases()) {
        SCOPED_TRACE(c.what);
        RecordedFile file(c.before);
        ASSERT_TRUE(Store(file, c.text));
        std::string state = c.before;
        std::size_t refused = 0;
        for (const RecordedFile::Change& change : file.changes) {
            for (std::size_t written = 0; written <= change.data.size(); ++written) {
                std::string torn = state;
                RecordedFile::Apply(torn, change, written);
                ExpectNoMixture(c, file.bytes, torn);
                if (HasFatalFailure()) return;
                refused += DocumentIn(torn)[0] == static_cast<char>(kUnfinishedDocument);
            }
            RecordedFile::Apply(state, change, change.data.size());
        }
        EXPECT_GE(refused, c.text.size() - 1) << "all but the two ends";
    }
}

// Without the mark, documents of these cases would be believed half old and half new.
TEST(DocumentStoreTest, APlainOverwriteWouldBeBelievedInPart) {
    int mixtures = 0;
    for (const Case& c : Cases()) {
        const std::string old = DocumentIn(c.before);
        for (std::size_t written = 1; written < std::min(old.size(), c.text.size()); ++written) {
            const std::string torn = c.text.substr(0, written) + old.substr(written);
            if (Trimmed(torn) != Trimmed(old) && Trimmed(torn) != Trimmed(c.text))
                mixtures += IsWellFormed(torn);
        }
    }
    EXPECT_GT(mixtures, 10);
}

// Between the mark and the first byte the disk may have any of the blocks.
TEST(DocumentStoreTest, BlocksInAnyOrderAreRefused) {
    std::mt19937 random(11);
    for (const Case& c : Cases()) {
        SCOPED_TRACE(c.what);
        RecordedFile file(c.before);
        ASSERT_TRUE(Store(file, c.text));
        std::string marked = c.before, unmarked = file.bytes;
        for (const RecordedFile::Change& change : file.changes) {
            RecordedFile::Apply(marked, change, change.data.size());
            if (change.data == std::string(1, static_cast<char>(kUnfinishedDocument))) break;
        }
        unmarked[kOffset] = static_cast<char>(kUnfinishedDocument);
        marked.resize(unmarked.size());
        for (const std::size_t block : {16u, 512u}) {
            const std::size_t blocks = unmarked.size() / block + 1;
            const bool all = blocks <= 8;
            for (std::size_t round = 0; round < (all ? std::size_t{1} << blocks : 300u); ++round) {
                std::string state = marked;
                for (std::size_t i = 0; i < blocks; ++i) {
                    const bool written = all ? (round >> i & 1) != 0 : (random() & 1) != 0;
                    if (written && i * block < state.size())
                        state.replace(i * block, block, unmarked, i * block, block);
                }
                ASSERT_FALSE(IsWellFormed(DocumentIn(state)));
            }
        }
    }
}

// One call fails or comes short: the store is taken back, or was not affected.
TEST(DocumentStoreTest, AStoreThatFailsIsTakenBack) {
    for (const Case& c : Cases()) {
        RecordedFile whole(c.before);
        ASSERT_TRUE(Store(whole, c.text));
        int failures = 0;
        for (int call = 0; call < whole.calls; ++call)
            for (const std::size_t parts : {0u, 1u, 2u}) {
                SCOPED_TRACE(std::string(c.what) + ", call " + std::to_string(call));
                RecordedFile file(c.before);
                file.limit = [&](int number, std::size_t size) {
                    return number == call ? size * parts / 3 : size;
                };
                const bool stored = Store(file, c.text);
                failures += !stored;
                EXPECT_EQ(file.bytes, stored ? whole.bytes : c.before);
            }
        EXPECT_GE(failures, 6);
    }
}

// From one call on none goes through: what cannot be taken back is refused.
TEST(DocumentStoreTest, AFileThatTakesNothingMoreHasNoMixture) {
    for (const Case& c : Cases()) {
        RecordedFile whole(c.before);
        ASSERT_TRUE(Store(whole, c.text));
        for (int call = 0; call < whole.calls; ++call)
            for (const std::size_t parts : {0u, 1u, 2u}) {
                SCOPED_TRACE(std::string(c.what) + ", call " + std::to_string(call));
                RecordedFile file(c.before);
                file.limit = [&](int number, std::size_t size) {
                    return number < call ? size : number == call ? size * parts / 3 : 0;
                };
                EXPECT_FALSE(Store(file, c.text));
                ExpectNoMixture(c, whole.bytes, file.bytes);
            }
    }
}

// The failure and what takes it back may be interrupted at any byte as well.
TEST(DocumentStoreTest, EveryPrefixOfTakingBackIsOldOrRefused) {
    for (const Case& c : Cases()) {
        RecordedFile whole(c.before);
        ASSERT_TRUE(Store(whole, c.text));
        for (int call = 0; call < whole.calls; ++call) {
            SCOPED_TRACE(std::string(c.what) + ", call " + std::to_string(call));
            RecordedFile file(c.before);
            file.limit = [&](int number, std::size_t size) {
                return number == call ? size / 2 : size;
            };
            Store(file, c.text);
            std::string state = c.before;
            for (const RecordedFile::Change& change : file.changes) {
                const std::size_t steps = change.cut ? 1 : change.data.size();
                for (std::size_t written = 0; written <= steps; ++written) {
                    std::string torn = state;
                    RecordedFile::Apply(torn, change, written);
                    ExpectNoMixture(c, whole.bytes, torn);
                    if (HasFatalFailure()) return;
                }
                RecordedFile::Apply(state, change, steps);
            }
        }
    }
}

// The end that a store has grown cannot be cut off: it is blanked, and the old document stands.
TEST(DocumentStoreTest, AnEndThatCannotBeCutIsBlanked) {
    const Case c = Cases()[2];
    RecordedFile file(c.before);
    file.cutsFail = true;
    bool marked = false;
    file.limit = [&](int, std::size_t size) {
        const bool refuse =
            !marked && file.bytes[kOffset] == static_cast<char>(kUnfinishedDocument);
        marked |= refuse;
        return refuse ? size / 2 : size;
    };
    EXPECT_FALSE(Store(file, c.text));
    EXPECT_TRUE(marked);
    EXPECT_GT(file.bytes.size(), c.before.size());
    file.bytes.resize(std::max(file.bytes.find_last_not_of('\n') + 1, c.before.size()));
    EXPECT_EQ(file.bytes, c.before);
}

// Neither the store nor what takes it back goes through, in every pair of places.
TEST(DocumentStoreTest, AStoreThatIsTakenBackInPartIsRefused) {
    for (const Case& c : Cases()) {
        RecordedFile whole(c.before);
        ASSERT_TRUE(Store(whole, c.text));
        for (const bool cutsFail : {false, true})
            for (int first = 0; first < whole.calls; ++first)
                for (int second = first + 1; second < first + 8; ++second) {
                    SCOPED_TRACE(std::string(c.what) + ", calls " + std::to_string(first) +
                                 " and " + std::to_string(second));
                    RecordedFile file(c.before);
                    file.cutsFail = cutsFail;
                    file.limit = [&](int number, std::size_t size) {
                        return number == first || number == second ? size / 2 : size;
                    };
                    Store(file, c.text);
                    ExpectNoMixture(c, whole.bytes, file.bytes);
                    if (HasFatalFailure()) return;
                }
    }
}

// A file whose old document is longer than any that is kept; it remembers the first byte alone.
class VastFile {
public:
    bool TellSize(std::uint64_t& size) const {
        size = kOffset + kMaxDocumentBytes + 1;
        return true;
    }
    std::size_t ReadAt(std::uint64_t, void*, std::size_t) {
        ++reads;
        return 0;
    }
    std::size_t WriteAt(std::uint64_t offset, const void* buffer, std::size_t size) {
        if (offset >= firstFailing) return 0;
        if (offset == kOffset) firstByte = *static_cast<const unsigned char*>(buffer);
        written += size;
        return size;
    }
    bool Truncate(std::uint64_t) { return false; }

    std::uint64_t firstFailing = ~std::uint64_t{0};
    std::uint64_t written = 0;
    int reads = 0;
    unsigned char firstByte = '<';
};

TEST(DocumentStoreTest, AnOldTextBeyondTheLimitIsReplacedAndNotKept) {
    const unsigned char text[] = {'<', 'A', '/', '>'};
    VastFile file;
    EXPECT_TRUE(DocumentStore<VastFile>(file, kOffset).Write(text, sizeof text));
    EXPECT_EQ(file.reads, 0);
    EXPECT_EQ(file.firstByte, '<');
    EXPECT_EQ(file.written, kMaxDocumentBytes + 2) << "the mark, and every byte once";
    VastFile failing;
    failing.firstFailing = kOffset + 1000000;
    EXPECT_FALSE(DocumentStore<VastFile>(failing, kOffset).Write(text, sizeof text));
    EXPECT_EQ(failing.reads, 0);
    EXPECT_EQ(failing.firstByte, kUnfinishedDocument) << "nothing is there to take back";
}

TEST(DocumentStoreTest, AFullDiskIsMetBeforeTheOldDocumentIsTouched) {
    const Case c = Cases()[2];
    RecordedFile file(c.before);
    file.limit = [calls = 0](int, std::size_t size) mutable { return ++calls == 3 ? 3 : size; };
    EXPECT_FALSE(Store(file, c.text));
    EXPECT_EQ(file.bytes, c.before);
    ASSERT_EQ(file.changes.size(), 2u) << "three line ends, and the cut";
    EXPECT_EQ(file.changes[0].data, "\n\n\n");
    EXPECT_TRUE(file.changes[1].cut);
}

TEST(DocumentStoreTest, NothingIsNoDocument) {
    RecordedFile file(std::string(50, 'x'));
    EXPECT_FALSE(Store(file, ""));
    EXPECT_EQ(file.calls, 0);
}

TEST(DocumentStoreTest, AnOldTextOfOneByteComesBack) {
    const std::string before = std::string(kOffset, 'p') + "o";
    RecordedFile file(before);
    bool failed = false;
    // Of the new text only the mark reaches the file.
    file.limit = [&](int, std::size_t size) {
        return size == 3 && !std::exchange(failed, true) ? 0 : size;
    };
    EXPECT_FALSE(Store(file, "<D/>"));
    EXPECT_TRUE(failed);
    EXPECT_EQ(file.bytes, before);
}

// A file with an old document of any length, of which only the first and the last bytes are real;
// every change of the body fails.
class LongFile {
public:
    explicit LongFile(std::uint64_t length) : size(kOffset + length) {}
    bool TellSize(std::uint64_t& answer) const {
        answer = size;
        return true;
    }
    std::size_t ReadAt(std::uint64_t, void*, std::size_t count) const { return count; }
    std::size_t WriteAt(std::uint64_t offset, const void*, std::size_t count) {
        if (offset == kOffset) ++marks;
        if (offset == kOffset + 1) lengths.push_back(count);
        return offset == kOffset + 1 && lengths.size() == 1 ? 0 : count;
    }
    bool Truncate(std::uint64_t) { return true; }

    std::uint64_t size;
    int marks = 0;                     // writes of the first byte alone
    std::vector<std::size_t> lengths;  // of what was written behind it
};

// The longest document that is read is also taken back whole; a longer one nobody ever read.
TEST(DocumentStoreTest, OldTextOfTheGreatestLengthComesBack) {
    const unsigned char text[] = "<D/>";
    for (const std::uint64_t length : {kMaxDocumentBytes, kMaxDocumentBytes + 1}) {
        LongFile file(length);
        EXPECT_FALSE(DocumentStore<LongFile>(file, kOffset).Write(text, 4));
        const bool back = length == kMaxDocumentBytes;
        EXPECT_EQ(file.marks, back ? 2 : 1);
        ASSERT_EQ(file.lengths.size(), back ? 2u : 1u);
        EXPECT_EQ(file.lengths.back(), back ? length - 1 : 3u);
    }
}

}  // namespace
}  // namespace zmctest
