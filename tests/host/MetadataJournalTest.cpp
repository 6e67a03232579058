// What is stored before survives a store that is cut off, wherever that happens.
#include "host/journal/MetadataJournal.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <filesystem>
#include <thread>

#include "host/file/MetadataDocument.h"
#include "host/raster/Raster.h"
#include "platform/File.h"
#include "platform/FileLock.h"
#include "platform/FileSystem.h"
#include "tests/support/FailureOf.h"
#include "tests/support/FileFaults.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

using zmctest::FailureOf;
using Outcome = Recovery::Outcome;
using zmctest::FileFault;
using zmctest::FileFaultAction;
using zmctest::FileFaults;
using Pixel = unsigned char;

std::string Trimmed(std::string text) {
    while (text.ends_with('\n')) text.pop_back();
    return text;
}

// A pyramid, and in it as many histograms as stores went through.
class MetadataJournalTest : public testing::Test {
protected:
    MetadataJournalTest() {
        Make();
        Store(Open());
        before = zmctest::ReadText(file);
    }

    void Make() {
        const zmctest::MemorySource<Pixel> source(20, 10, 1);
        Raster raster = Raster::Create(TestModule(), file, source.props, 0);
        raster.Write<Pixel>(0, {0, 0, 20, 10}, std::vector<Pixel>(200, 7));
        ASSERT_TRUE(raster.IsComplete());
        front = raster.Header().tileDataEnd;
    }
    // The module stays loaded, so that children find it ready.
    static ModulePtr TestModule() {
        static const ModulePtr module = zmctest::TestModule();
        return module;
    }
    Raster Open() { return Raster::Open(TestModule(), file); }

    static void Store(Raster raster, bool keep = false) {
        raster.KeepCopies(keep);
        zelm::RasterBandHistogram<Pixel> histogram;
        histogram.binCount = 3;
        for (const std::uint64_t count : {100u, 60u, 40u}) histogram.counts.Append(count);
        raster.SetHistograms<Pixel>({histogram});
    }
    static std::size_t Stores(const Raster& raster) { return raster.Histograms<Pixel>().size(); }
    std::string Document() const { return zmctest::ReadText(file).substr(front); }

    // What a store with a copy leaves when it is cut off at once.
    void LeaveCopy(const std::string& systemRun = platform::SystemRun()) {
        const pid_t child = fork();
        if (child == 0) {
            const MetadataJournal* const left = new MetadataJournal(file);
            _exit(left ? 0 : 1);
        }
        waitpid(child, nullptr, 0);
        auto record = JournalRecord::Decode(zmctest::ReadText(copy));
        ASSERT_TRUE(record);
        record->systemRun = systemRun;
        zmctest::WriteText(copy, record->Encode());
    }

    FileFault Fault(std::size_t n, FileFaultAction action, int error = EIO) const {
        FileFault fault;
        fault.folder = folder.String();
        fault.n = n;
        fault.action = action;
        fault.error = error;
        return fault;
    }

    // Ends in the middle of `action`, at the n-th call; false once it ends of itself.
    template <class Action>
    bool KilledAt(std::size_t n, FileFaultAction how, Action action) {
        const pid_t child = fork();
        if (child == 0) {
            const FileFaults faults(Fault(n, how));
            try {
                action();
            } catch (...) {
                _exit(1);
            }
            _exit(0);
        }
        int status = 0;
        waitpid(child, &status, 0);
        EXPECT_TRUE(WIFSIGNALED(status) || WEXITSTATUS(status) == 0);
        return WIFSIGNALED(status);
    }

    std::vector<std::string> Names() const {
        std::vector<std::string> names = platform::ListFolder(folder.String());
        std::erase_if(names, [](const std::string& name) { return name == "." || name == ".."; });
        std::sort(names.begin(), names.end());
        return names;
    }

    zmctest::ScratchDirectory folder;
    std::string file = folder / "a.pyr";
    std::string copy = folder / "a.pyr.zmcmeta";
    std::string before;
    std::uint64_t front = 0;
};

TEST_F(MetadataJournalTest, AStoreWithACopyEndsLikeOneWithout) {
    Store(Open());
    const std::string plain = zmctest::ReadText(file);
    zmctest::WriteText(file, before);
    Store(Open(), true);
    EXPECT_EQ(zmctest::ReadText(file), plain);
    EXPECT_THAT(Names(), testing::ElementsAre("a.pyr"));
    EXPECT_EQ(Open().RecoveryNote(), "");
}

TEST_F(MetadataJournalTest, AllThreeStoresKeepCopies) {
    Raster raster = Open();
    raster.KeepCopies(true);
    FileFault fault = Fault(1, FileFaultAction::Error);
    fault.calls = zmctest::kSyncCall;
    zelm::RasterBandStats<Pixel> stats;
    const FileFaults faults(fault);
    const auto expect = testing::HasSubstr("cannot keep a copy of its metadata document");
    EXPECT_THAT(FailureOf([&] { raster.SetStatistics<Pixel>({stats}); }), expect);
    const FileFaults* const kept = &faults;
    EXPECT_EQ(kept->Failed(), 1u);
    EXPECT_EQ(zmctest::ReadText(file), before);
    EXPECT_THAT(Names(), testing::ElementsAre("a.pyr"));
}

TEST_F(MetadataJournalTest, PalettesAndStatisticsGoThrough) {
    Raster raster = Open();
    raster.KeepCopies(true);
    zelm::RasterBandStats<Pixel> stats;
    raster.SetStatistics<Pixel>({stats});
    zelm::Palette palette;
    Pixel channels[4] = {1, 2, 3, 4};
    palette.AddColor(zelm::RGBAColor(zelm::Array<Pixel>(channels, zelm::ArrayShape(4))));
    raster.SetBandPalette(0, palette);
    EXPECT_TRUE(Open().HasStatistics(0));
    EXPECT_TRUE(Open().BandPalette(0));
    EXPECT_THAT(Names(), testing::ElementsAre("a.pyr"));
}

TEST_F(MetadataJournalTest, KilledAtEveryCallItIsOldOrNew) {
    Store(Open());
    const std::string after = zmctest::ReadText(file);
    for (const auto how : {FileFaultAction::Kill, FileFaultAction::KillPartway}) {
        std::size_t n = 1, restored = 0;
        for (;; ++n) {
            SCOPED_TRACE(n);
            zmctest::WriteText(file, before);
            if (!KilledAt(n, how, [&] { Store(Open(), true); })) break;
            EXPECT_EQ(zmctest::ReadText(file).substr(0, front), before.substr(0, front));
            const Raster raster = Open();
            const std::size_t stores = Stores(raster);
            restored += raster.RecoveryNote().find("again the one of before") != std::string::npos;
            EXPECT_EQ(Trimmed(zmctest::ReadText(file)), Trimmed(stores == 1 ? before : after));
            EXPECT_FALSE(std::filesystem::exists(copy));
        }
        EXPECT_GT(n, 20u);
        EXPECT_GE(restored, 2u);
        Store(Open(), true);
        EXPECT_THAT(Names(), testing::ElementsAre("a.pyr")) << "leavings go with the next store";
    }
}

TEST_F(MetadataJournalTest, KilledAtEveryCallOfTheFirstStore) {
    std::filesystem::resize_file(file, front);
    before = zmctest::ReadText(file);
    std::size_t n = 1;
    for (;; ++n) {
        SCOPED_TRACE(n);
        zmctest::WriteText(file, before);
        if (!KilledAt(n, FileFaultAction::KillPartway, [&] { Store(Open(), true); })) break;
        const std::size_t stores = Stores(Open());
        EXPECT_EQ(JudgeMetadata(file, PyramidHeader::Read(file)), "");
        Store(Open(), true);
        EXPECT_EQ(Stores(Open()), stores + 1) << "and it can be stored into again";
    }
    EXPECT_GT(n, 15u);
}

TEST_F(MetadataJournalTest, EveryCallThatFailsIsToldOrMakesNoDifference) {
    struct Kind {
        FileFaultAction action;
        int error;
        bool fromThenOn;
    };
    for (const Kind& kind : {Kind{FileFaultAction::Error, EIO, false},
                             {FileFaultAction::Error, ENOSPC, true},
                             {FileFaultAction::Error, EIO, true},
                             {FileFaultAction::Error, EINTR, false},
                             {FileFaultAction::Short, EIO, false}}) {
        std::size_t n = 1;
        for (bool reached = true; reached; ++n) {
            SCOPED_TRACE(n);
            zmctest::WriteText(file, before);
            Raster raster = Open();
            std::string failure;
            {
                FileFault fault = Fault(n, kind.action, kind.error);
                fault.fromThenOn = kind.fromThenOn;
                const FileFaults faults(fault);
                failure = FailureOf([&] { Store(std::move(raster), true); });
                reached = faults.Failed() != 0;
            }
            const std::size_t stores = Stores(Open());
            EXPECT_TRUE(stores == 2 || (stores == 1 && failure != "no failure")) << failure;
            EXPECT_FALSE(std::filesystem::exists(copy));
        }
        EXPECT_GT(n, 15u);
    }
}

// --- putting back ---

TEST_F(MetadataJournalTest, DamagedDocumentIsPutBack) {
    for (const std::string& rest : {std::string(), std::string(500, 'x'), std::string("\n")}) {
        LeaveCopy();
        zmctest::WriteText(file, before.substr(0, front) + "\x1A" + rest);
        const Raster raster = Open();
        EXPECT_THAT(raster.RecoveryNote(), testing::HasSubstr("again the one of before"));
        EXPECT_EQ(zmctest::ReadText(file), before);
        EXPECT_THAT(Names(), testing::ElementsAre("a.pyr"));
    }
}

TEST_F(MetadataJournalTest, WhoOpensForReadingLeavesACopyAndTheDamageAsTheyAre) {
    LeaveCopy();
    const std::string damaged = before.substr(0, front) + "\x1A" + std::string(500, 'x');
    zmctest::WriteText(file, damaged);
    const std::string left = zmctest::ReadText(copy);
    {
        Raster raster = Raster::Open(TestModule(), file, Access::Read);
        EXPECT_NE(raster.RecoveryNote(), "");
        EXPECT_EQ(raster.Read<Pixel>(0, {0, 0, 20, 10}), std::vector<Pixel>(200, 7));
        EXPECT_NE(FailureOf([&] { Store(std::move(raster), true); }), "no failure");
    }
    EXPECT_EQ(zmctest::ReadText(file), damaged);
    EXPECT_EQ(zmctest::ReadText(copy), left);
    EXPECT_THAT(Names(), testing::ElementsAre("a.pyr", "a.pyr.zmcmeta"));
    Open();
    EXPECT_EQ(zmctest::ReadText(file), before) << "who opens for writing puts it in order";
}

TEST_F(MetadataJournalTest, RecoveryThatIsKilledIsRepeated) {
    for (const auto how : {FileFaultAction::Kill, FileFaultAction::KillPartway})
        for (std::size_t n = 1;; ++n) {
            SCOPED_TRACE(n);
            zmctest::WriteText(file, before);
            LeaveCopy();
            zmctest::WriteText(file, before.substr(0, front) + "\x1A" + std::string(700, 'x'));
            const bool killed = KilledAt(n, how, [&] { RecoverMetadata(file); });
            RecoverMetadata(file);
            EXPECT_EQ(zmctest::ReadText(file), before);
            EXPECT_THAT(Names(), testing::ElementsAre("a.pyr"));
            if (!killed) break;
        }
}

TEST_F(MetadataJournalTest, RecoveryThatFailsIsTold) {
    bool reached = true;
    for (std::size_t n = 1; reached; ++n) {
        SCOPED_TRACE(n);
        zmctest::WriteText(file, before);
        LeaveCopy();
        zmctest::WriteText(file, before.substr(0, front) + "\x1A" + std::string(700, 'x'));
        Recovery recovery;
        {
            const FileFaults faults(Fault(n, FileFaultAction::Error));
            recovery = RecoverMetadata(file);
            reached = faults.Failed() != 0;
        }
        EXPECT_EQ(recovery.text.empty(), recovery.outcome == Outcome::Nothing);
        RecoverMetadata(file);
        EXPECT_EQ(zmctest::ReadText(file), before);
    }
}

// After a power failure a document may be well-formed and a mixture all the same.
TEST_F(MetadataJournalTest, AfterANewStartOfTheSystemOnlyTheOldTextIsBelieved) {
    Store(Open());
    const std::string after = zmctest::ReadText(file);
    zmctest::WriteText(file, before);
    LeaveCopy("another start");
    zmctest::WriteText(file, after);
    EXPECT_EQ(RecoverMetadata(file).outcome, Outcome::Restored);
    EXPECT_EQ(zmctest::ReadText(file), before);

    LeaveCopy("another start");
    zmctest::WriteText(file, before + "\n\n");
    EXPECT_EQ(RecoverMetadata(file).outcome, Outcome::Complete) << "the file had grown, no more";
    EXPECT_EQ(zmctest::ReadText(file), before + "\n\n");
    EXPECT_EQ(RecoverMetadata(file).outcome, Outcome::Nothing);
}

TEST_F(MetadataJournalTest, InOneRunOfTheSystemAWholeDocumentIsBelieved) {
    if (platform::SystemRun().empty()) GTEST_SKIP() << "the system does not tell its runs";
    Store(Open());
    const std::string after = zmctest::ReadText(file);
    zmctest::WriteText(file, before);
    LeaveCopy();
    zmctest::WriteText(file, after);
    const Raster raster = Open();
    EXPECT_THAT(raster.RecoveryNote(), testing::HasSubstr("is whole"));
    EXPECT_EQ(Stores(raster), 2u);
    EXPECT_FALSE(std::filesystem::exists(copy));
}

TEST_F(MetadataJournalTest, FileWithoutADocumentGetsItsEndBack) {
    std::filesystem::resize_file(file, front);
    LeaveCopy();
    zmctest::WriteText(file, before.substr(0, front) + "\x1A<DATA");
    EXPECT_EQ(RecoverMetadata(file).outcome, Outcome::Restored);
    EXPECT_EQ(zmctest::ReadText(file), before.substr(0, front));
}

TEST_F(MetadataJournalTest, UnfinishedFileKeepsTheTilesThatItGotSince) {
    const std::uint64_t end = PyramidHeader::Read(file).tileDataStart;
    for (const bool tiles : {false, true}) {
        std::filesystem::resize_file(file, end);
        LeaveCopy();
        const auto stream =
            platform::File::Open(zelm::String(file.c_str()).wide, platform::File::Mode::Update);
        if (tiles) stream->WriteAt(end, "tiles", 5);
        stream->WriteAt(front, "\x1A", 1);
        EXPECT_EQ(RecoverMetadata(file).outcome, Outcome::Restored);
        EXPECT_EQ(std::filesystem::file_size(file), tiles ? front : end);
        EXPECT_EQ(zmctest::ReadText(file).substr(end, 5) == "tiles", tiles);
    }
}

// --- copies that are not used ---

TEST_F(MetadataJournalTest, TornCopyIsNeverUsed) {
    LeaveCopy();
    const std::string whole = zmctest::ReadText(copy);
    const std::string damaged = before.substr(0, front) + "\x1A";
    zmctest::WriteText(file, damaged);
    const auto expectUnused = [&](const std::string& bytes) {
        zmctest::WriteText(copy, bytes);
        const Recovery recovery = RecoverMetadata(file);
        ASSERT_EQ(recovery.outcome, Outcome::Unusable);
        ASSERT_THAT(recovery.text, testing::HasSubstr("it is torn"));
        ASSERT_EQ(zmctest::ReadText(file), damaged);
    };
    for (std::size_t size = 0; size < whole.size(); ++size) expectUnused(whole.substr(0, size));
    for (std::size_t at = 0; at < whole.size(); ++at) {
        std::string flipped = whole;
        flipped[at] = static_cast<char>(flipped[at] ^ 4);
        expectUnused(flipped);
    }
    expectUnused(whole + '\0');
    EXPECT_THAT(Open().RecoveryNote(), testing::HasSubstr("it is torn"));
    EXPECT_THAT(FailureOf([&] { Store(Open(), true); }), testing::HasSubstr("cannot keep a copy"));
}

TEST_F(MetadataJournalTest, CopyOfAnotherFileIsNeverUsed) {
    LeaveCopy();
    const std::string damaged = before.substr(0, front) + "\x1A";
    const auto expectUnused = [&](const char* why) {
        const Recovery recovery = RecoverMetadata(file);
        EXPECT_EQ(recovery.outcome, Outcome::Unusable);
        EXPECT_THAT(recovery.text, testing::HasSubstr(why));
        EXPECT_EQ(zmctest::ReadText(file), damaged);
    };
    // Another file under its name, of the same shape; the old one lives, so that its number does.
    std::filesystem::rename(file, folder / "old.pyr");
    zmctest::WriteText(file, damaged);
    expectUnused("of another file");
    std::filesystem::rename(folder / "old.pyr", file);
    auto record = JournalRecord::Decode(zmctest::ReadText(copy));
    for (std::uint64_t* number : {&record->offset, &record->frontSum, &record->frontSize}) {
        zmctest::WriteText(file, damaged);
        *number += 1;
        zmctest::WriteText(copy, record->Encode());
        expectUnused("of another file");
        *number -= 1;
    }
    zmctest::WriteText(copy, record->Encode());
    std::filesystem::resize_file(file, front - 1);
    EXPECT_THAT(RecoverMetadata(file).text, testing::HasSubstr("has lost tiles"));
}

TEST_F(MetadataJournalTest, NewFileUnderTheNameTakesItsCopyAway) {
    LeaveCopy();
    Make();
    EXPECT_FALSE(std::filesystem::exists(copy));
}

// A store that has failed puts its old document into its own file, and into no other.
TEST_F(MetadataJournalTest, FileThatTookTheNameDuringAStoreIsNotWrittenTo) {
    const std::string other = before + std::string(1, '\x1A');
    {
        MetadataJournal journal(file);
        zmctest::WriteText(file + ".new", other);
        std::filesystem::rename(file + ".new", file);
    }
    EXPECT_TRUE(zmctest::ReadText(file) == other);
}

TEST_F(MetadataJournalTest, StoreUnderWayIsLeftAlone) {
    const std::string damaged = before.substr(0, front) + "\x1A";
    {
        const MetadataJournal held(file);
        zmctest::WriteText(file, damaged);
        EXPECT_EQ(RecoverMetadata(file).outcome, Outcome::UnderWay);
        EXPECT_EQ(zmctest::ReadText(file), damaged);
        EXPECT_THAT(FailureOf([&] { const MetadataJournal second(file); }),
                    testing::HasSubstr("another process is storing"));
        EXPECT_THAT(FailureOf([&] { DiscardMetadata(file); }),
                    testing::HasSubstr("another process is storing"));
        EXPECT_EQ(Open().RecoveryNote(), "");
    }
    EXPECT_EQ(zmctest::ReadText(file), before) << "it never finished";
    EXPECT_THAT(Names(), testing::ElementsAre("a.pyr"));
}

// Who looks has the lock of a copy for a moment, and nobody is to be told of a store for that.
TEST_F(MetadataJournalTest, RecoveryWaitsForThoseWhoLook) {
    LeaveCopy();
    platform::FileLock looker;
    ASSERT_EQ(looker.Take(copy, platform::FileLock::Kind::Shared),
              platform::FileLock::Result::Taken);
    std::thread leaving([&] {
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
        looker.Release();
    });
    const Outcome outcome = RecoverMetadata(file).outcome;
    leaving.join();
    EXPECT_EQ(outcome, Outcome::Complete);
    EXPECT_THAT(Names(), testing::ElementsAre("a.pyr"));
}

TEST_F(MetadataJournalTest, RecoveryDoesNotWaitForEver) {
    LeaveCopy();
    platform::FileLock looker;
    ASSERT_EQ(looker.Take(copy, platform::FileLock::Kind::Shared),
              platform::FileLock::Result::Taken);
    EXPECT_EQ(RecoverMetadata(file).outcome, Outcome::UnderWay);
}

TEST_F(MetadataJournalTest, DamagedDocumentIsNotCopied) {
    zmctest::WriteText(file, before.substr(0, front) + "\x1A");
    EXPECT_THAT(FailureOf([&] { const MetadataJournal none(file); }),
                testing::HasSubstr("a store did not end"));
    EXPECT_THAT(Names(), testing::ElementsAre("a.pyr"));
}

TEST_F(MetadataJournalTest, NamesThatAreLongOrLinksHaveCopiesToo) {
    const std::string name(250, 'n');
    std::filesystem::rename(file, folder / name);
    const std::string place = MetadataJournal::PathFor(folder / name);
    EXPECT_LE(platform::NameOf(place).size(), 255u);
    EXPECT_NE(place, MetadataJournal::PathFor(folder / (name + 'n')));
    std::filesystem::create_symlink(name, folder / "link");
    EXPECT_EQ(MetadataJournal::PathFor(folder / "link"), place);
    file = folder / "link";
    Store(Open(), true);
    EXPECT_EQ(Stores(Open()), 2u);
}

// --- discarding ---

TEST_F(MetadataJournalTest, DiscardingMakesRoomForNewStatistics) {
    zmctest::WriteText(file, before.substr(0, front) + "\x1A<DATASET/>");
    EXPECT_THAT(FailureOf([&] { Store(Open()); }), testing::HasSubstr("did not store them"));
    DiscardMetadata(file);
    EXPECT_EQ(zmctest::ReadText(file), before.substr(0, front));
    Store(Open());
    EXPECT_EQ(zmctest::ReadText(file), before);
}

TEST_F(MetadataJournalTest, WhatIsGoodIsNotDiscarded) {
    EXPECT_THAT(FailureOf([&] { DiscardMetadata(file); }), testing::HasSubstr("not damaged"));
    LeaveCopy();
    zmctest::WriteText(file, before.substr(0, front) + "\x1A");
    EXPECT_THAT(FailureOf([&] { DiscardMetadata(file); }),
                testing::HasSubstr("which can be put back"));
    zmctest::WriteText(copy, "torn");
    DiscardMetadata(file);
    EXPECT_EQ(zmctest::ReadText(file), before.substr(0, front));
    EXPECT_THAT(Names(), testing::ElementsAre("a.pyr"));
}

// --- judging ---

TEST(MetadataDocument, IsJudgedAsReadersDo) {
    EXPECT_EQ(JudgeMetadataText("<DATASET/>\n\n"), "");
    EXPECT_EQ(
        JudgeMetadataText("<?xml version='1.0' encoding='ISO-8859-1'?><DATASET>\xE9</DATASET>"),
        "");
    std::string deep, names = "<DATASET>";
    for (int i = 0; i < 65; ++i) deep += "<A>";
    for (int i = 0; i < 400; ++i) names += "<N" + std::to_string(i) + "/>";
    const std::pair<std::string, const char*> wrong[] = {
        {"", "is empty"},
        {" \n\t\r\n", "is empty"},
        {"\x1A?xml version='1.0'?><DATASET/>", "a store did not end"},
        {std::string("<DATASET/>\0", 11), "bytes of 0"},
        {"<DATASET/>\xC3", "middle of a character"},
        {"<DATASET>", "malformed: line 1"},
        {"<DATASET/>\n<DATASET/>", "malformed: line 2"},
        {"text", "malformed"},
        {"<DATASET>\x1A</DATASET>", "malformed"},
        {"<!DOCTYPE DATASET><DATASET/>", "malformed"},
        {"<DATASET>&a;</DATASET>", "malformed"},
        {deep, "too deeply"},
        {names + "</DATASET>", "too many unknown names"},
        {"<OTHER/>", "no root DATASET"}};
    for (const auto& [text, reason] : wrong)
        EXPECT_THAT(JudgeMetadataText(text), testing::HasSubstr(reason)) << text;
}

TEST(JournalRecord, ComesBackAsItWas) {
    JournalRecord record;
    record.offset = 1;
    record.fileSize = ~std::uint64_t{0};
    record.fileNumber = 3;
    record.frontSize = 4;
    record.frontSum = 5;
    record.systemRun = "run";
    record.text = std::string("text\0\n", 6);
    const auto read = JournalRecord::Decode(record.Encode());
    ASSERT_TRUE(read);
    EXPECT_EQ(read->Encode(), record.Encode());
    EXPECT_EQ(read->fileSize, record.fileSize);
    EXPECT_EQ(read->systemRun, "run");
    EXPECT_EQ(read->text, record.text);
}

}  // namespace
}  // namespace zmchost
