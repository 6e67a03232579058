#include "format/DocumentText.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <random>
#include <string>
#include <vector>

#include "pyramid/DocumentStore.h"

namespace zmctest {

using namespace zelm;
namespace {

constexpr std::uint64_t kTextOffset = 4;

std::string TextOf(const DocumentText& text) {
    return text.bytes ? std::string(reinterpret_cast<const char*>(text.bytes.get()), text.size)
                      : std::string("none");
}

// A file that goes through its states while it is read: before every byte and every look at the
// size, `advance` tells how many states on it is.
class ChangingFile {
public:
    ChangingFile(const std::vector<std::string>& all, std::function<std::size_t()> clock)
        : states(all), advance(std::move(clock)) {}

    bool TellSize(std::uint64_t& size) {
        size = Now().size();
        return true;
    }
    std::size_t ReadAt(std::uint64_t offset, void* buffer, std::size_t size) {
        ++reads;
        std::size_t done = 0;
        for (; done < size; ++done) {
            const std::string& now = Now();
            if (offset + done >= now.size()) break;
            static_cast<char*>(buffer)[done] = now[offset + done];
        }
        return done;
    }

    int reads = 0;

private:
    const std::string& Now() {
        state = std::min(state + advance(), states.size() - 1);
        return states[state];
    }
    const std::vector<std::string>& states;
    std::function<std::size_t()> advance;
    std::size_t state = 0;
};

// A file that takes down all its states.
class StateFile {
public:
    explicit StateFile(std::string content) : states{std::move(content)} {}
    bool TellSize(std::uint64_t& size) const {
        size = states.back().size();
        return true;
    }
    std::size_t ReadAt(std::uint64_t offset, void* buffer, std::size_t size) {
        const std::string piece = states.back().substr(offset, size);
        std::copy(piece.begin(), piece.end(), static_cast<char*>(buffer));
        return piece.size();
    }
    std::size_t WriteAt(std::uint64_t offset, const void* buffer, std::size_t size) {
        for (std::size_t i = 0; i < size; ++i) {
            std::string next = states.back();
            next.resize(std::max<std::size_t>(next.size(), offset + i + 1));
            next[offset + i] = static_cast<const char*>(buffer)[i];
            states.push_back(next);
        }
        return size;
    }
    bool Truncate(std::uint64_t) { return false; }

    std::vector<std::string> states;
};

// The states of a file with one document after the other. As documents do, each keeps the front of
// the one before.
std::vector<std::string> StatesOf(const std::vector<std::string>& documents) {
    StateFile file("tile");
    for (const std::string& document : documents)
        DocumentStore<StateFile>(file, kTextOffset)
            .Write(reinterpret_cast<const unsigned char*>(document.data()), document.size());
    return file.states;
}

const std::vector<std::string> kDocuments = {"<D><A/></D>\n", "<D><A/><B/></D>\n",
                                             "<D><A/><B/><C/></D>\n"};

bool IsOneOf(const std::string& text) {
    if (text == "none" || text[0] == static_cast<char>(kUnfinishedDocument)) return true;
    const std::string trimmed = text.substr(0, text.find_last_not_of('\n') + 2);
    return std::find(kDocuments.begin(), kDocuments.end(), trimmed) != kDocuments.end();
}

TEST(DocumentTextTest, NothingIsNotUnfinished) { EXPECT_FALSE(DocumentText().IsUnfinished()); }

TEST(DocumentTextTest, AtRestItIsReadTwice) {
    const std::vector<std::string> states = {"tile<D/>"};
    ChangingFile file(states, [] { return 0; });
    EXPECT_EQ(TextOf(DocumentText::Take(file, kTextOffset)), "<D/>");
    EXPECT_EQ(file.reads, 2);
}

TEST(DocumentTextTest, ThereIsNone) {
    for (const std::string content : {"", "til", "tile"}) {
        const std::vector<std::string> states = {content};
        ChangingFile file(states, [] { return 0; });
        EXPECT_FALSE(DocumentText::Take(file, kTextOffset).bytes);
        EXPECT_EQ(file.reads, 0);
    }
}

TEST(DocumentTextTest, LongTextsAreComparedToTheirEnd) {
    std::string whole = "tile<D>" + std::string(100000, ' ') + "</D>";
    std::string other = whole;
    other.back() = '\n';
    const std::vector<std::string> states = {whole, other};
    std::size_t bytes = 0;
    ChangingFile file(states, [&] { return ++bytes == 150000 ? 1 : 0; });
    EXPECT_EQ(TextOf(DocumentText::Take(file, kTextOffset)), other.substr(kTextOffset));
    EXPECT_GT(file.reads, 10) << "taken again, in pieces";
}

TEST(DocumentTextTest, AMarkThatStaysIsAnAnswer) {
    const std::vector<std::string> states = {
        "tile\x1A"
        "D/>"};
    ChangingFile file(states, [] { return 0; });
    const DocumentText text = DocumentText::Take(file, kTextOffset);
    EXPECT_EQ(TextOf(text),
              "\x1A"
              "D/>");
    EXPECT_TRUE(text.IsUnfinished());
    EXPECT_EQ(file.reads, 8) << "four looks, of two readings each";
}

TEST(DocumentTextTest, ATextThatNeverRestsIsNone) {
    std::vector<std::string> states;
    for (int i = 0; i < 1000; ++i) states.push_back("tile<D" + std::to_string(i % 10) + "/>");
    ChangingFile file(states, [] { return 1; });
    EXPECT_FALSE(DocumentText::Take(file, kTextOffset).bytes);
    EXPECT_LE(file.reads, 32) << "and the reader does not wait for it for good";
}

// The whole of a store, or any part of it, happens at one moment of the reading, whichever.
TEST(DocumentTextTest, AStoreInOneMomentOfTheReading) {
    const auto states = StatesOf({kDocuments[0], kDocuments[1]});
    for (std::size_t from = 0; from < states.size(); ++from)
        for (std::size_t to = from; to < states.size(); ++to)
            for (std::size_t moment = 0; moment < 40; ++moment) {
                std::size_t events = 0;
                ChangingFile file(states, [&] {
                    const std::size_t event = events++;
                    return event == 0 ? from : event == moment + 1 ? to - from : 0;
                });
                const std::string text = TextOf(DocumentText::Take(file, kTextOffset));
                ASSERT_TRUE(IsOneOf(text)) << from << ' ' << to << ' ' << moment << ' ' << text;
            }
}

TEST(DocumentTextTest, StoresAtAnyPace) {
    const auto states = StatesOf(kDocuments);
    std::mt19937 random(5);
    int mixturesOfOneReading = 0, taken = 0;
    for (int round = 0; round < 200000; ++round) {
        const std::uint32_t pace = 1u << random() % 8;
        const auto clock = [&, leap = 1 + random() % 60] {
            return random() % pace == 0 ? random() % leap : 0;
        };
        ChangingFile file(states, clock);
        const std::string text = TextOf(DocumentText::Take(file, kTextOffset));
        ASSERT_TRUE(IsOneOf(text)) << text;
        taken += text[0] == '<';
        ChangingFile once(states, clock);
        std::uint64_t size = 0;
        once.TellSize(size);
        std::string single(32, '\n');
        once.ReadAt(kTextOffset, single.data(), size > kTextOffset ? 32 : 0);
        mixturesOfOneReading += !IsOneOf(single);
    }
    EXPECT_GT(taken, 20000);
    EXPECT_GT(mixturesOfOneReading, 1000) << "one reading would not do";
}

}  // namespace
}  // namespace zmctest
