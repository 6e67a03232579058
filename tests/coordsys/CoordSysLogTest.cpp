#include "coordsys/CoordSysLog.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <sys/stat.h>

#include <atomic>
#include <chrono>
#include <sstream>
#include <thread>

#include "tests/coordsys/ProbeRun.h"
#include "tests/support/ScratchDirectory.h"
#include "zmcg/zmcg.h"

namespace zelm {
namespace {

using testing::EndsWith;
using testing::HasSubstr;
using testing::MatchesRegex;
using testing::Not;
using zmctest::ChildResult;
using zmctest::ReadText;
using zmctest::ScratchDirectory;
using zmctest::SmallDisk;
using zmctest::WriteText;

const std::string kFirst = "logs/zmcpe_pe_1.log";
const std::string kSecond = "logs/zmcpe_pe_2.log";

// What a line has beside its message: time, two numbers, separators, blank and newline.
constexpr std::size_t kLineFrame = 24 + 2 + 5 + 2 + 5 + 2 + 2;

class CoordSysLogRun : public testing::Test {
protected:
    ChildResult Log(int count, unsigned level, std::size_t length = 10) {
        return RunProbe({"log", scratch.String(), std::to_string(count), std::to_string(level),
                         std::to_string(length)});
    }
    ChildResult LogByLine(const std::string& line, int count = 1, unsigned level = 1,
                          std::size_t length = 10) {
        WriteControlLine(scratch, line);
        return Log(count, level, length);
    }
    void MakeLogs(std::size_t first, std::size_t second) {
        std::filesystem::create_directory(scratch / "logs");
        WriteText(scratch / kFirst, std::string(first, '1'));
        WriteText(scratch / kSecond, std::string(second, '2'));
    }
    std::string First() const { return ReadText(scratch / kFirst); }
    std::string Second() const { return ReadText(scratch / kSecond); }
    bool HasLogs() const { return std::filesystem::exists(scratch / "logs"); }

    ScratchDirectory scratch;
};

TEST_F(CoordSysLogRun, FirstRunWritesTheNotesAndNoLog) {
    EXPECT_THAT(Log(1, 8192).err,
                HasSubstr("mask=0 debugger=0 file=0 open=0 current=0 sequence=0"));
    EXPECT_EQ(ReadText(scratch / "pelog.txt"), ReadText(ZMC_NOTES_FILE));
    EXPECT_FALSE(HasLogs());
}

TEST_F(CoordSysLogRun, NotesHaveThirtyFiveLinesWithTheirBlanks) {
    Log(0, 0);
    std::istringstream notes(ReadText(scratch / "pelog.txt"));
    std::vector<std::string> lines;
    for (std::string line; std::getline(notes, line);) lines.push_back(line);
    ASSERT_EQ(lines.size(), 35u);
    EXPECT_EQ(lines[1], "#              Projection Logging Usage Notes ");
    EXPECT_EQ(lines[9], "#  - for example: 0110, 0000, 0000, 0001");
    EXPECT_EQ(lines[22], "#  - 0000, 0000, 1000, 0000 = Level 8 = ");
    EXPECT_EQ(lines[32], "#  ");
    EXPECT_EQ(lines[33], "# Change this line to enable or disable logging features.");
    EXPECT_EQ(lines[34], "0000, 0000, 0000, 0000");
}

TEST_F(CoordSysLogRun, DefaultFileAndItsEditedLineStayOff) {
    Log(0, 0);
    EXPECT_THAT(Log(1, 8192).err, HasSubstr("mask=0 debugger=0 file=0"));
    std::string notes = ReadText(scratch / "pelog.txt");
    notes.replace(notes.rfind("0000, 0000, 0000, 0000"), 22, "1111, 1111, 1111, 1111");
    WriteText(scratch / "pelog.txt", notes);
    EXPECT_THAT(Log(1, 8192).err, HasSubstr("mask=0 debugger=0 file=0"));
    EXPECT_FALSE(HasLogs());
}

struct ControlLine {
    const char* line;
    const char* fields;
};

class CoordSysLogControl : public CoordSysLogRun,
                           public testing::WithParamInterface<ControlLine> {};

TEST_P(CoordSysLogControl, SetsTheFields) {
    EXPECT_THAT(LogByLine(GetParam().line, 0).err, HasSubstr(GetParam().fields)) << GetParam().line;
}

const ControlLine kControlLines[] = {
    {"0110,0000,0000,0001", "mask=8193 debugger=0 file=1"},
    {"1000,0000,0000,0000", "mask=0 debugger=1 file=0"},
    {"0000,0000,0000,0001", "mask=0 debugger=0 file=0"},
    {"0111,1111,1111,1111", "mask=16383 debugger=0 file=1"},
    {"1111,1111,1111,1111", "mask=16383 debugger=1 file=1"},
    {"1001,0000,0000,0000", "mask=4096 debugger=1 file=0"},
    {"1000,1000,0000,0000", "mask=2048 debugger=1 file=0"},
    {"1000,0100,0000,0000", "mask=1024 debugger=1 file=0"},
    {"1000,0010,0000,0000", "mask=512 debugger=1 file=0"},
    {"1000,0001,0000,0000", "mask=256 debugger=1 file=0"},
    {"1000,0000,1000,0000", "mask=128 debugger=1 file=0"},
    {"1000,0000,0100,0000", "mask=64 debugger=1 file=0"},
    {"1000,0000,0010,0000", "mask=32 debugger=1 file=0"},
    {"1000,0000,0001,0000", "mask=16 debugger=1 file=0"},
    {"1000,0000,0000,1000", "mask=8 debugger=1 file=0"},
    {"1000,0000,0000,0100", "mask=4 debugger=1 file=0"},
    {"1000,0000,0000,0010", "mask=2 debugger=1 file=0"},
    {"1000,0000,0000,0001", "mask=1 debugger=1 file=0"},
    {"1,10,,,,,,,,,,,,,01", "mask=8193 debugger=1 file=0"},
    {"0110,0000,0000,0001 and more", "mask=8193 debugger=0 file=1"},
    {"0110,0000,0000,0001,1111", "mask=8193 debugger=0 file=1"},
    // Refused: too short, another digit, blanks, a comma out of place.
    {"0110,0000,0000,000", "mask=0 debugger=0 file=0"},
    {"0110,0000,0000,0002", "mask=0 debugger=0 file=0"},
    {"0110, 0000, 0000, 0001", "mask=0 debugger=0 file=0"},
    {"01100,000,0000,0001", "mask=0 debugger=0 file=0"},
    {"0110,000000000,0001", "mask=0 debugger=0 file=0"},
    // The first line that begins with a digit ends the search.
    {"0\n0110,0000,0000,0001", "mask=0 debugger=0 file=0"},
    {"1 comment\n0110,0000,0000,0001", "mask=0 debugger=0 file=0"},
    {" 0\n2\n\nx\n0110,0000,0000,0001\n0000,0000,0000,0000", "mask=8193 debugger=0 file=1"},
};

INSTANTIATE_TEST_SUITE_P(Lines, CoordSysLogControl, testing::ValuesIn(kControlLines));

TEST_F(CoordSysLogRun, ControlLineNeedsNoNewline) {
    WriteText(scratch / "pelog.txt", "0110,0000,0000,0001");
    EXPECT_THAT(Log(0, 0).err, HasSubstr("mask=8193 debugger=0 file=1"));
    WriteText(scratch / "pelog.txt", "");
    EXPECT_THAT(Log(0, 0).err, HasSubstr("mask=0 debugger=0 file=0"));
}

TEST_F(CoordSysLogRun, LongCommentIsReadInPieces) {
    // A piece of a comment that begins with a digit counts as a line: 1023 characters are read.
    const std::string comment(1023, '#');
    WriteText(scratch / "pelog.txt", comment + "0110,0000,0000,0001\n");
    EXPECT_THAT(Log(0, 0).err, HasSubstr("mask=8193 "));
    WriteText(scratch / "pelog.txt", comment + "#0110,0000,0000,0001\n");
    EXPECT_THAT(Log(0, 0).err, HasSubstr("mask=0 "));
}

TEST_F(CoordSysLogRun, ControlFileThatCannotBeReadLeavesTheLogOff) {
    std::filesystem::create_directory(scratch / "pelog.txt");
    EXPECT_THAT(Log(1, 8192).err, HasSubstr("mask=0 debugger=0 file=0"));
}

TEST_F(CoordSysLogRun, MissingDirectoryMeansNoLog) {
    const ChildResult result = RunProbe({"log", scratch / "none", "1", "8192", "5"});
    EXPECT_EQ(result.err, "no log\nno log\n");
}

TEST_F(CoordSysLogRun, DirectoryOutsideAsciiNeedsALocaleThatHoldsIt) {
    const std::string directory = scratch / "pe\xC3\xA4";
    std::filesystem::create_directory(directory);
    zmctest::WriteText(directory + "/pelog.txt", "0110,0000,0000,0000\n");
    EXPECT_EQ(RunProbe({"log", directory, "1", "8192", "5"}).err, "no log\nno log\n");
    EXPECT_THAT(RunProbe({"utf8", "log", directory, "1", "8192", "5"}).err,
                HasSubstr("sequence=1"));
    EXPECT_THAT(ReadText(directory + "/logs/zmcpe_pe_1.log"), HasSubstr(", xxxxx \n"));
}

TEST_F(CoordSysLogRun, LinesHaveTheirForm) {
    LogByLine("0110,0000,0000,0001", 2, 1, 5);
    const std::string time =
        "[A-Z][a-z]{2} [A-Z][a-z]{2} [ 0-9][0-9] [0-9]{2}:[0-9]{2}:[0-9]{2} [0-9]{4}";
    EXPECT_THAT(First(), MatchesRegex(time + ",     0,     1, xxxxx \n" + time +
                                      ",     0,     2, xxxxx \n"));
}

TEST_F(CoordSysLogRun, LevelsPassByMask) {
    EXPECT_THAT(LogByLine("0110,0000,0000,0000", 1, 8192).err, HasSubstr("sequence=1"));
    EXPECT_THAT(LogByLine("0100,0000,0000,0001", 1, 8192).err, HasSubstr("mask=1"));
    EXPECT_THAT(LogByLine("0100,0000,0000,0001", 1, 8192).err, Not(HasSubstr("sequence=1")));
}

TEST_F(CoordSysLogRun, DebuggerGetsTheMessageAlone) {
    EXPECT_THAT(LogByLine("1000,0000,0000,0001", 2, 1, 5).err, HasSubstr("\nxxxxx\nxxxxx\n"));
    EXPECT_FALSE(HasLogs());
    EXPECT_THAT(LogByLine("1000,0000,0000,0000", 2, 1, 5).err, Not(HasSubstr("xxxxx")));
}

TEST_F(CoordSysLogRun, BothDestinationsAtOnce) {
    EXPECT_THAT(LogByLine("1100,0000,0000,0001", 1, 1, 5).err, HasSubstr("\nxxxxx\n"));
    EXPECT_THAT(First(), EndsWith(",     1, xxxxx \n"));
}

TEST_F(CoordSysLogRun, NextProcessContinuesTheFirstFile) {
    LogByLine("0110,0000,0000,0001", 3);
    const std::string before = First();
    LogByLine("0110,0000,0000,0001", 1);
    EXPECT_EQ(First().substr(0, before.size()), before);
    EXPECT_THAT(First(), EndsWith(",     1, xxxxxxxxxx \n"));
}

TEST_F(CoordSysLogRun, FirstFileBelowTheLimitIsContinued) {
    MakeLogs(499999, 7);
    EXPECT_THAT(LogByLine("0110,0000,0000,0001", 0).err, HasSubstr("current=1"));
    EXPECT_EQ(First().size(), 499999u);
    EXPECT_EQ(Second().size(), 7u);
}

TEST_F(CoordSysLogRun, FirstFileAtTheLimitGivesWayToTheSecond) {
    for (const std::size_t size : {500000u, 500001u}) {
        MakeLogs(size, 7);
        EXPECT_THAT(LogByLine("0110,0000,0000,0001", 0).err, HasSubstr("open=1 current=2"));
        EXPECT_EQ(First().size(), size);
        EXPECT_EQ(Second().size(), 7u);
    }
}

TEST_F(CoordSysLogRun, SecondFileJustBelowTheLimitIsContinued) {
    MakeLogs(500000, 499999);
    EXPECT_THAT(LogByLine("0110,0000,0000,0001", 0).err, HasSubstr("open=1 current=2"));
    EXPECT_EQ(Second().size(), 499999u);
}

TEST_F(CoordSysLogRun, TwoFullFilesEmptyTheFirst) {
    MakeLogs(500001, 500000);
    EXPECT_THAT(LogByLine("0110,0000,0000,0001", 0).err, HasSubstr("open=1 current=1"));
    EXPECT_EQ(First().size(), 0u);
    EXPECT_EQ(Second().size(), 500000u);
}

// While writing, a file of exactly the limit is not yet full.
TEST_F(CoordSysLogRun, WritingUpToTheLimitStaysInTheFile) {
    for (const std::size_t size : {499999u, 500000u}) {
        MakeLogs(499000, 7);
        const std::size_t length = size - 499000 - kLineFrame;
        EXPECT_THAT(LogByLine("0110,0000,0000,0001", 1, 1, length).err,
                    HasSubstr("current=1 sequence=1"));
        EXPECT_EQ(First().size(), size);
        EXPECT_EQ(Second().size(), 7u);
    }
}

TEST_F(CoordSysLogRun, LineThatPassesTheLimitIsTheLastOfItsFile) {
    MakeLogs(499000, 7);
    const std::size_t length = 500001 - 499000 - kLineFrame;
    EXPECT_THAT(LogByLine("0110,0000,0000,0001", 1, 1, length).err,
                HasSubstr("current=2 sequence=1"));
    EXPECT_EQ(First().size(), 500001u);
    EXPECT_EQ(Second().size(), 0u);
}

TEST_F(CoordSysLogRun, FilesAlternateForReal) {
    constexpr std::size_t kLength = 958;  // lines of 1000 bytes
    static_assert(kLength + kLineFrame == 1000);
    // 501 lines fill a file: with 500 it holds exactly the limit.
    EXPECT_THAT(LogByLine("0110,0000,0000,0001", 501 + 501 + 3, 1, kLength).err,
                HasSubstr("current=1 sequence=1005"));
    EXPECT_EQ(First().size(), 3000u);
    EXPECT_EQ(Second().size(), 501000u);
    EXPECT_THAT(First().substr(0, 50), HasSubstr(",  1003, x"));
    EXPECT_THAT(Second().substr(0, 50), HasSubstr(",   502, x"));
}

TEST_F(CoordSysLogRun, LongMessagesAreCutAndNotLost) {
    // The line passes through the same buffer as the message, so that its own end is cut off.
    LogByLine("0110,0000,0000,0001", 1, 1, 20000);
    EXPECT_EQ(First().size(), 4095u);
    EXPECT_THAT(First(), EndsWith("xxx"));
}

TEST_F(CoordSysLogRun, LinesOfTwoThreadsStayWholeOverRotations) {
    WriteControlLine(scratch, "0100,0000,0000,0001");
    const ChildResult result = RunProbe({"threads", scratch.String(), "4000"});
    EXPECT_THAT(result.err, HasSubstr("sequence=8000"));
    const auto whole = MatchesRegex(".{24},     0, [ 0-9]{5}, (a{200}|b{300}) ");
    for (const std::string& text : {First(), Second()}) {
        std::istringstream lines(text);
        for (std::string line; std::getline(lines, line);) ASSERT_THAT(line, whole);
    }
    EXPECT_GT(First().size() + Second().size(), 500000u);
}

TEST_F(CoordSysLogRun, LogsThatIsAFileEndsTheLoggingToFiles) {
    WriteText(scratch / "logs", "");
    EXPECT_THAT(LogByLine("1110,0000,0000,0001", 1, 1, 5).err,
                HasSubstr("mask=8193 debugger=1 file=0 open=0 current=1 sequence=0\nxxxxx\n"));
}

TEST_F(CoordSysLogRun, FirstFileThatCannotBeOpenedEndsTheLoggingToFiles) {
    std::filesystem::create_directories(scratch / kFirst);
    EXPECT_THAT(LogByLine("0110,0000,0000,0001").err,
                HasSubstr("file=0 open=0 current=1 sequence=0"));
}

TEST_F(CoordSysLogRun, SecondFileThatCannotBeOpenedAtStartWritesNothing) {
    MakeLogs(500000, 0);
    std::filesystem::remove(scratch / kSecond);
    std::filesystem::create_directory(scratch / kSecond);
    EXPECT_THAT(LogByLine("0110,0000,0000,0001", 3).err,
                HasSubstr("file=1 open=0 current=2 sequence=0"));
    EXPECT_EQ(First().size(), 500000u);
}

TEST_F(CoordSysLogRun, FailedRotationEndsTheLoggingToFiles) {
    MakeLogs(499990, 0);
    std::filesystem::remove(scratch / kSecond);
    std::filesystem::create_directory(scratch / kSecond);
    EXPECT_THAT(LogByLine("1110,0000,0000,0001", 3, 1, 5).err,
                HasSubstr("xxxxx\nxxxxx\nxxxxx\nmask=8193 debugger=1 file=1 open=0 current=2 "
                          "sequence=1"));
}

TEST_F(CoordSysLogRun, ReadOnlyDirectoryLeavesFilesOff) {
    SmallDisk disk(scratch.String(), "size=64k");
    if (!disk.IsMounted()) GTEST_SKIP() << "mounting a small disk is not permitted here";
    WriteControlLine(scratch, "0110,0000,0000,0001");
    ASSERT_TRUE(disk.MakeReadOnly());
    EXPECT_THAT(Log(1, 1).err, HasSubstr("mask=8193 debugger=0 file=0 open=0"));
    EXPECT_FALSE(HasLogs());
}

TEST_F(CoordSysLogRun, ReadOnlyDirectoryWithoutControlFileIsSilent) {
    SmallDisk disk(scratch.String(), "size=64k");
    if (!disk.IsMounted()) GTEST_SKIP() << "mounting a small disk is not permitted here";
    ASSERT_TRUE(disk.MakeReadOnly());
    EXPECT_THAT(Log(1, 1).err, HasSubstr("mask=0 debugger=0 file=0 open=0"));
}

TEST_F(CoordSysLogRun, FullDiskEndsTheLoggingToFiles) {
    SmallDisk disk(scratch.String(), "size=64k");
    if (!disk.IsMounted()) GTEST_SKIP() << "mounting a small disk is not permitted here";
    WriteControlLine(scratch, "0110,0000,0000,0001");
    std::filesystem::create_directory(scratch / "logs");
    const ChildResult result = Log(1000, 1, 958);
    EXPECT_THAT(result.err, HasSubstr("file=1 open=0 current=1"));
    EXPECT_THAT(result.err, Not(HasSubstr("sequence=1000")));
    EXPECT_GT(First().size(), 0u);
    EXPECT_LE(First().size(), 65536u);
}

// A line that is larger than the stream's buffer is written past it, and leaves nothing behind that
// a later flush could fail on.
TEST_F(CoordSysLogRun, LongLineOnAFullDiskEndsTheLoggingToFiles) {
    std::filesystem::create_directory(scratch / "logs");
    std::filesystem::create_symlink("/dev/full", scratch / kFirst);
    WriteControlLine(scratch, "0110,0000,0000,0001");
    const ChildResult result = RunProbe({"log", scratch.String(), "3", "1", "4000", "8364"});
    EXPECT_THAT(result.err, HasSubstr("file=1 open=0 current=1 sequence=1"));
}

// A control file that is a pipe holds the creation up until a line is written into it.
TEST_F(CoordSysLogRun, IsSeenByOthersOnlyWhenItIsReady) {
    ASSERT_EQ(mkfifo((scratch / "pelog.txt").c_str(), 0600), 0);
    std::atomic<bool> ready{false};
    std::thread creator([&] {
        CoordSysLog::CreateInstance(scratch.String().c_str());
        ready = true;
    });
    std::this_thread::sleep_for(std::chrono::milliseconds(100));
    EXPECT_FALSE(ready);
    EXPECT_EQ(std::atomic_ref(gpCoordSysLogInstance).load(), nullptr);
    WriteText(scratch / "pelog.txt", "1000,0000,0000,0001\n");
    creator.join();
    ASSERT_NE(gpCoordSysLogInstance, nullptr);
    EXPECT_EQ(gpCoordSysLogInstance->levelMask, 1u);
    delete gpCoordSysLogInstance;
    gpCoordSysLogInstance = nullptr;
}

TEST(CoordSysLog, WithoutAnInstanceMessagesVanish) {
    ASSERT_EQ(gpCoordSysLogInstance, nullptr);
    CoordSysLog::LogMessage(8192, u"%s", u"nobody listens");
    EXPECT_EQ(gpCoordSysLogInstance, nullptr);
}

TEST(CoordSysLog, NullDirectoryMeansNoLog) {
    EXPECT_EQ(CoordSysLog::CreateInstance(String()), nullptr);
    EXPECT_EQ(gpCoordSysLogInstance, nullptr);
}

}  // namespace
}  // namespace zelm
