// Many processes read one file while another writes tiles and stores records: what readers may see
// is told by numbers that the writer keeps in shared memory, of writes begun and of writes ended.
//
// A reader that starts when k writes have ended, and is done when n have begun, may see each of the
// states from k to n. Of the archive it may also see nothing, but only while a store is under way.
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <new>
#include <random>

#include "tests/concurrency/GenerationFile.h"
#include "tests/support/CampaignLength.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmctest {
namespace {

using Clock = std::chrono::steady_clock;
using Number = std::atomic<std::uint32_t>;

constexpr std::uint32_t kReaders = 8;
constexpr std::uint32_t kMaxRounds = 4000;
constexpr std::uint32_t kGenerations = 24;  // of a round; the archive grows with each
constexpr unsigned kPatience = 60;          // seconds for one look at a file

struct Progress {
    Number begun{0}, ended{0};
};

// One round has one file.
struct Round {
    Progress tiles[GenerationFile::kMovingTiles];
    Progress statistics, histograms, palettes;
    Progress stores;  // of all three kinds
};

struct Tally {
    std::atomic<std::uint64_t> opens{0}, rectangles{0}, fetches{0};
    std::atomic<std::uint64_t> settled{0};  // fetches that saw all that had begun
    std::atomic<std::uint64_t> older{0};    // that saw a state before that
    std::atomic<std::uint64_t> none{0};     // that saw nothing while a store was under way
    std::atomic<std::uint64_t> torn{0};     // rectangles with two generations of one tile
    char fault[200] = {};                   // the first thing seen that may not be
};

struct Board {
    std::atomic<bool> stop{false};
    Number round{0};  // the file of that number is there; 0 is none
    Tally tallies[kReaders];
    Round rounds[kMaxRounds];
};

// The board lies in memory that parent and children share.
class SharedBoard {
public:
    SharedBoard()
        : place(mmap(nullptr, sizeof(Board), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1,
                     0)),
          board(place == MAP_FAILED ? nullptr : new (place) Board) {}
    ~SharedBoard() {
        if (board) munmap(place, sizeof(Board));
    }
    SharedBoard(const SharedBoard&) = delete;
    SharedBoard& operator=(const SharedBoard&) = delete;
    Board& operator*() const { return *board; }
    Board* operator->() const { return board; }

private:
    void* place;
    Board* board;
};

std::string FileOf(const std::string& folder, std::uint32_t round) {
    return folder + "/round" + std::to_string(round) + ".pyr";
}

// What had ended when a look began.
struct Before {
    std::uint32_t tiles[GenerationFile::kMovingTiles];
    std::uint32_t stores, statistics, histograms, palettes;

    explicit Before(const Round& round)
        : stores(round.stores.ended),
          statistics(round.statistics.ended),
          histograms(round.histograms.ended),
          palettes(round.palettes.ended) {
        for (std::uint32_t i = 0; i < GenerationFile::kMovingTiles; ++i)
            tiles[i] = round.tiles[i].ended;
    }
};

class Reader {
public:
    Reader(Board& sharedBoard, std::uint32_t number, std::string filesFolder)
        : board(sharedBoard),
          tally(sharedBoard.tallies[number]),
          folder(std::move(filesFolder)),
          module(zmctest::TestModule()),
          random(number + 1) {}

    void Run() {
        while (!board.stop && tally.fault[0] == 0) {
            alarm(kPatience);
            const std::uint32_t number = board.round;
            if (number == 0)
                usleep(1000);
            else
                LookAt(number);
        }
    }

private:
    Board& board;
    Tally& tally;
    std::string folder;
    zmchost::ModulePtr module;
    std::mt19937 random;
    std::uint32_t keptRound = 0;
    std::unique_ptr<GenerationFile> kept;
    std::optional<Before> keptBefore;

    void Fault(const std::string& text) {
        if (tally.fault[0] == 0) std::snprintf(tally.fault, sizeof tally.fault, "%s", text.c_str());
    }

    // The writer removes a file when the next is there.
    std::unique_ptr<GenerationFile> Open(std::uint32_t number) {
        auto file = std::make_unique<GenerationFile>(module, FileOf(folder, number));
        ++tally.opens;
        if (file->IsOpen()) return file;
        if (board.round == number) Fault("a file does not open");
        return nullptr;
    }

    void LookAt(std::uint32_t number) {
        const Round& round = board.rounds[number];
        if (keptRound != number) {
            keptBefore.emplace(round);
            kept = Open(number);
            keptRound = number;
        }
        const Before before(round);
        if (const auto fresh = Open(number)) {
            LookAtPixels(*fresh, round);
            LookAtArchive(*fresh, round, before);
        }
        if (!kept) return;
        LookAtPixels(*kept, round);
        LookAtArchive(*kept, round, *keptBefore);
    }

    Rectangle AnyRectangle() {
        if (random() % 4 == 0) return GenerationFile::kMoving[random() % 3];
        Rectangle r;
        r.level = static_cast<std::int32_t>(random() % 2);
        const std::uint32_t width = GenerationFile::kSamples >> r.level;
        const std::uint32_t height = GenerationFile::kLines >> r.level;
        r.x = static_cast<std::uint32_t>(random() % width);
        r.y = static_cast<std::uint32_t>(random() % height);
        r.width = 1 + static_cast<std::uint32_t>(random() % (width - r.x));
        r.height = 1 + static_cast<std::uint32_t>(random() % (height - r.y));
        return r;
    }

    void LookAtPixels(GenerationFile& file, const Round& round) {
        const Before before(round);
        const GenerationFile::Seen seen = file.Look(AnyRectangle());
        ++tally.rectangles;
        if (!seen.fault.empty()) Fault(seen.fault);
        for (std::uint32_t i = 0; i < GenerationFile::kMovingTiles; ++i) {
            if (seen.lowest[i] > seen.highest[i]) continue;
            if (seen.lowest[i] < before.tiles[i]) Fault("a sample older than the last write");
            if (seen.highest[i] > round.tiles[i].begun) Fault("a sample that nobody wrote");
            if (seen.lowest[i] != seen.highest[i]) ++tally.torn;
        }
    }

    void LookAtArchive(GenerationFile& file, const Round& round, const Before& before) {
        std::string fault;
        const GenerationFile::Sets sets = file.Count(static_cast<std::uint32_t>(random()), fault);
        if (!fault.empty()) Fault(fault);
        // One document holds all three kinds: a store of one may hide the others.
        const bool busy = round.stores.begun != before.stores;
        Judge("statistics", sets.statistics, before.statistics, round.statistics.begun, busy);
        Judge("histograms", sets.histograms, before.histograms, round.histograms.begun, busy);
        Judge("palettes", sets.palettes, before.palettes, round.palettes.begun, busy);
    }

    void Judge(const char* kind, std::optional<std::uint32_t> sets, std::uint32_t ended,
               std::uint32_t begun, bool busy) {
        ++tally.fetches;
        if (!sets) {
            ++tally.none;
            if (ended != 0 && !busy) Fault(std::string("no ") + kind + ", and no store under way");
            return;
        }
        if (*sets < ended || *sets > begun)
            Fault(std::string(kind) + " of generation " + std::to_string(*sets) + ", not from " +
                  std::to_string(ended) + " to " + std::to_string(begun));
        ++(*sets == begun ? tally.settled : tally.older);
    }
};

// Children that read until the board says stop.
class ReaderProcesses {
public:
    ReaderProcesses(Board& sharedBoard, const std::string& folder) : board(sharedBoard) {
        for (std::uint32_t i = 0; i < kReaders; ++i) {
            const pid_t child = fork();
            if (child == 0) RunAndExit(i, folder);
            children.push_back(child);
        }
    }
    ~ReaderProcesses() { board.stop = true; }

    // Waits for all; what went wrong with them, or nothing.
    std::string Join() {
        board.stop = true;
        std::string faults;
        for (std::uint32_t i = 0; i < children.size(); ++i) {
            int status = 0;
            if (waitpid(children[i], &status, 0) != children[i] || status != 0)
                faults += "reader " + std::to_string(i) + " ended with status " +
                          std::to_string(status) +
                          (WIFSIGNALED(status) && WTERMSIG(status) == SIGALRM ? " (hung)\n" : "\n");
            if (board.tallies[i].fault[0] != 0)
                faults += "reader " + std::to_string(i) + ": " + board.tallies[i].fault + "\n";
        }
        return faults;
    }

private:
    Board& board;
    std::vector<pid_t> children;

    // The module says on the standard error stream what it thinks of a document in the making.
    [[noreturn]] void RunAndExit(std::uint32_t number, const std::string& folder) {
        const std::string log = folder + "/reader" + std::to_string(number) + ".log";
        if (!std::freopen(log.c_str(), "w", stderr)) _exit(2);
        int status = 0;
        try {
            Reader(board, number, folder).Run();
        } catch (...) {
            status = 3;
        }
        _exit(status);
    }
};

template <class Write>
void Do(Progress& progress, Write write) {
    ++progress.begun;
    EXPECT_TRUE(write());
    ++progress.ended;
}

class ReadersAndWriter : public testing::TestWithParam<FileKind> {
protected:
    zmctest::ScratchDirectory folder;
    SharedBoard board;

    void WriteRound(const zmchost::ModulePtr& module, std::uint32_t number) {
        Round& round = board->rounds[number];
        const std::string path = FileOf(folder.String(), number);
        auto file = std::make_unique<GenerationFile>(module, GetParam(), path);
        ASSERT_TRUE(file->IsOpen());
        board->round = number;
        for (std::uint32_t generation = 1; generation <= kGenerations; ++generation) {
            for (std::uint32_t i = 0; i < GenerationFile::kMovingTiles; ++i)
                Do(round.tiles[i], [&] { return file->WriteMoving(i, generation); });
            const auto store = [&](Progress& kind,
                                   bool (GenerationFile::*operation)(std::uint32_t)) {
                Do(round.stores, [&] {
                    Do(kind, [&] { return (*file.*operation)(generation); });
                    return true;
                });
            };
            store(round.statistics, &GenerationFile::StoreStatistics);
            store(round.histograms, &GenerationFile::StoreHistograms);
            store(round.palettes, &GenerationFile::StorePalette);
            // What is stored after reopening joins what the file holds.
            if (generation % 8 == 0) file = std::make_unique<GenerationFile>(module, path);
            ASSERT_TRUE(file->IsOpen());
        }
    }

    void Report() {
        std::uint64_t opens = 0, rectangles = 0, fetches = 0, settled = 0, older = 0, none = 0,
                      torn = 0;
        for (const Tally& tally : board->tallies) {
            opens += tally.opens;
            rectangles += tally.rectangles;
            fetches += tally.fetches;
            settled += tally.settled;
            older += tally.older;
            none += tally.none;
            torn += tally.torn;
        }
        std::printf(
            "%s: %u readers, %u files of %u generations, %ju opens, %ju rectangles (%ju with two "
            "generations of a tile), %ju fetches: %ju newest, %ju older, %ju none\n",
            GetParam().name, kReaders, board->round.load(), kGenerations, std::uintmax_t{opens},
            std::uintmax_t{rectangles}, std::uintmax_t{torn}, std::uintmax_t{fetches},
            std::uintmax_t{settled}, std::uintmax_t{older}, std::uintmax_t{none});
        EXPECT_GT(settled, 0u);
    }
};

TEST_P(ReadersAndWriter, SeeOldOrNewOrNoRecordsAndExactPixels) {
    const auto end =
        Clock::now() + CampaignLength(std::chrono::seconds(4), std::chrono::seconds(90));
    ReaderProcesses readers(*board, folder.String());
    const zmchost::ModulePtr module = zmctest::TestModule();
    std::uint32_t number = 0;
    while (Clock::now() < end && number + 1 < kMaxRounds && !HasFailure()) {
        WriteRound(module, ++number);
        std::error_code ignored;
        std::filesystem::remove(FileOf(folder.String(), number - 1), ignored);
    }
    EXPECT_EQ(readers.Join(), "");
    Report();
}

INSTANTIATE_TEST_SUITE_P(Orderings, ReadersAndWriter, testing::ValuesIn(kFileKinds),
                         [](const auto& test) { return std::string(test.param.name); });

}  // namespace
}  // namespace zmctest
