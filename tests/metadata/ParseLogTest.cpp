#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <sstream>

#include "tests/support/ChildProcess.h"
#include "tests/support/ScratchDirectory.h"

namespace {

using testing::EndsWith;
using testing::HasSubstr;
using testing::MatchesRegex;
using testing::Not;
using testing::StartsWith;
using zmctest::ChildResult;
using zmctest::ReadText;
using zmctest::RunChild;
using zmctest::ScratchDirectory;

const std::string kDir = "metadata_parse_log_dir";
const std::string kLevel = "metadata_parse_log_level";
const std::string kConsole = "metadata_parse_log_console";
const std::string kFile = "metadata_parse_log.log";
const std::string kHeaderText = "  MetadataImpl Parse Log.   Log Level is set to: ";

class ParseLog : public testing::Test {
protected:
    // Runs the probe with those three settings; "-" leaves one out.
    ChildResult Run(const std::string& directory, const std::string& level,
                    const std::string& console, std::vector<std::string> words = {"build", "1"}) {
        std::vector<std::string> environment = {kDir, kLevel, kConsole};
        if (directory != "-") environment.push_back(kDir + "=" + directory);
        if (level != "-") environment.push_back(kLevel + "=" + level);
        if (console != "-") environment.push_back(kConsole + "=" + console);
        words.insert(words.begin(), ZMC_PARSE_LOG_PROBE);
        ChildResult result = RunChild(words, environment);
        EXPECT_EQ(result.status, 0) << result.err;
        return result;
    }
    std::string Log() const { return ReadText(scratch / kFile); }
    bool HasFile() const { return std::filesystem::exists(scratch / kFile); }
    std::string Here() const { return scratch.String(); }

    ScratchDirectory scratch;
};

TEST_F(ParseLog, ThreeVariablesMakeOneLogForManyMetadata) {
    const ChildResult result = Run(Here(), "1", "0", {"build", "20"});
    EXPECT_THAT(result.err, HasSubstr("level=1 console=0 open=1 path=" + Here() + "/" + kFile));
    EXPECT_THAT(result.err, Not(HasSubstr("another log")));
    EXPECT_THAT(
        Log(), MatchesRegex(
                   "\n[A-Z][a-z]{2} [A-Z][a-z]{2} [ 0-9][0-9] [0-9]{2}:[0-9]{2}:[0-9]{2} [0-9]{4}" +
                   kHeaderText + "1\n\n"));
    EXPECT_EQ(result.out, "");
}

TEST_F(ParseLog, NoVariablesNoLog) {
    EXPECT_THAT(Run("-", "-", "-").err, HasSubstr("level=0 console=0 open=0"));
}

TEST_F(ParseLog, WithoutDirectoryNoLog) {
    EXPECT_THAT(Run("-", "3", "1").err, HasSubstr("level=0 console=0 open=0"));
    EXPECT_THAT(Run("", "3", "1").err, HasSubstr("level=0 console=0 open=0"));
}

TEST_F(ParseLog, WithoutLevelNoLog) {
    EXPECT_THAT(Run(Here(), "-", "1").err, HasSubstr("level=0 console=0 open=0"));
    EXPECT_THAT(Run(Here(), "", "1").err, HasSubstr("level=0 console=0 open=0"));
    EXPECT_FALSE(HasFile());
}

TEST_F(ParseLog, WithoutConsoleTheLevelStandsAndNoFileIsMade) {
    EXPECT_THAT(Run(Here(), "3", "-").err, HasSubstr("level=3 console=0 open=0"));
    EXPECT_THAT(Run(Here(), "3", "", {"log", "1", "lost"}).err, HasSubstr("level=3 console=0"));
    EXPECT_FALSE(HasFile());
}

TEST_F(ParseLog, LevelZeroMakesNoFile) {
    EXPECT_THAT(Run(Here(), "0", "1").err, HasSubstr("level=0 console=0 open=0"));
    EXPECT_FALSE(HasFile());
}

TEST_F(ParseLog, LevelsAreDecimalHexadecimalOrOctal) {
    EXPECT_THAT(Run(Here(), "0x10", "0").err, HasSubstr("level=16 "));
    EXPECT_THAT(Log(), HasSubstr(kHeaderText + "16\n\n"));
    EXPECT_THAT(Run(Here(), "010", "0x0").err, HasSubstr("level=8 console=0"));
    EXPECT_THAT(Run(Here(), "12abc", "010").err, HasSubstr("level=12 console=8"));
    EXPECT_THAT(Run(Here(), "abc", "0").err, HasSubstr("level=0 "));
}

TEST_F(ParseLog, LevelsHaveThirtyTwoBits) {
    EXPECT_THAT(Run(Here(), "4294967295", "0").err, HasSubstr("level=4294967295 "));
    EXPECT_THAT(Run(Here(), "4294967296", "0").err, HasSubstr("level=4294967295 "));
    EXPECT_THAT(Run(Here(), "-1", "0").err, HasSubstr("level=4294967295 "));
    EXPECT_THAT(Run(Here(), "-2", "0").err, HasSubstr("level=4294967294 "));
}

// Whose low bits look like a small level is as far out of range as any other.
TEST_F(ParseLog, LevelsBeyondSixtyFourBitsAreTheHighestToo) {
    for (const char* text : {"18446744069414584321", "18446744073709551615", "18446744073709551616",
                             "-18446744073709551615", "-18446744073709551600",
                             "-0xFFFFFFFF00000001", "-4294967296", "99999999999999999999999"})
        EXPECT_THAT(Run(Here(), text, "0").err, HasSubstr("level=4294967295 ")) << text;
    EXPECT_THAT(Run(Here(), "1", "18446744069414584321").err, HasSubstr("console=4294967295 "));
    EXPECT_THAT(Run(Here(), "-4294967295", "0").err, HasSubstr("level=1 "));
}

TEST_F(ParseLog, MakesTheLastComponentOfTheDirectory) {
    EXPECT_THAT(Run(scratch / "new", "1", "0").err, HasSubstr("level=1 "));
    EXPECT_THAT(ReadText(scratch / ("new/" + kFile)), HasSubstr(kHeaderText));
}

TEST_F(ParseLog, TwoMissingComponentsLeaveTheLogOff) {
    EXPECT_THAT(Run(scratch / "a/b", "1", "0").err, HasSubstr("level=0 console=0 open=0"));
    EXPECT_FALSE(std::filesystem::exists(scratch / "a"));
}

TEST_F(ParseLog, DirectoryThatIsAFileLeavesTheLogOff) {
    zmctest::WriteText(scratch / "file", "");
    EXPECT_THAT(Run(scratch / "file", "1", "0").err, HasSubstr("level=0 console=0 open=0"));
}

TEST_F(ParseLog, FileThatCannotBeOpenedLeavesTheLogOff) {
    std::filesystem::create_directory(scratch / kFile);
    EXPECT_THAT(Run(Here(), "1", "0").err, HasSubstr("level=0 console=0 open=0"));
}

TEST_F(ParseLog, FailedFileStillLetsLevelZeroReachTheConsole) {
    std::filesystem::create_directory(scratch / kFile);
    EXPECT_EQ(Run(Here(), "1", "1", {"log", "0", "zero"}).out, "zero\n");
    EXPECT_EQ(Run(Here(), "1", "1", {"log", "1", "one"}).out, "");
}

TEST_F(ParseLog, ReadOnlyDirectoryLeavesTheLogOff) {
    std::filesystem::create_directory(scratch / "ro");
    zmctest::SmallDisk disk(scratch / "ro", "size=64k");
    if (!disk.IsMounted()) GTEST_SKIP() << "mounting a small disk is not permitted here";
    ASSERT_TRUE(disk.MakeReadOnly());
    EXPECT_THAT(Run(scratch / "ro", "1", "0").err, HasSubstr("level=0 console=0 open=0"));
    EXPECT_THAT(Run(scratch / "ro/new", "1", "0").err, HasSubstr("level=0 console=0 open=0"));
}

TEST_F(ParseLog, FullDiskShowsNowhere) {
    std::filesystem::create_directory(scratch / "full");
    zmctest::SmallDisk disk(scratch / "full", "size=64k");
    if (!disk.IsMounted()) GTEST_SKIP() << "mounting a small disk is not permitted here";
    disk.Fill();
    EXPECT_THAT(Run(scratch / "full", "1", "0", {"threads", "100"}).err, HasSubstr("level=1 "));
    EXPECT_EQ(ReadText(scratch / ("full/" + kFile)), "");
}

TEST_F(ParseLog, DirectoryNamesAreBytes) {
    const std::string name = scratch / "d\xc3\xa4\xff";
    EXPECT_THAT(Run(name, "1", "0").err, HasSubstr("path=" + name + "/" + kFile));
    EXPECT_THAT(ReadText(name + "/" + kFile), HasSubstr(kHeaderText));
}

TEST_F(ParseLog, EveryProcessBeginsAfresh) {
    Run(Here(), "1", "0", {"log", "1", "first process"});
    EXPECT_THAT(Log(), EndsWith("first process\n"));
    Run(Here(), "1", "0", {"log", "1", "second process"});
    EXPECT_THAT(Log(), EndsWith("second process\n"));
    EXPECT_THAT(Log(), Not(HasSubstr("first process")));
}

TEST_F(ParseLog, OnlyMessagesUpToTheLevelAreWritten) {
    Run(Here(), "1", "0", {"log", "2", "two"});
    EXPECT_THAT(Log(), Not(HasSubstr("two")));
    Run(Here(), "2", "0", {"log", "2", "two"});
    EXPECT_THAT(Log(), EndsWith("\n\ntwo\n"));
}

TEST_F(ParseLog, ConsoleGetsWhatTheFileGets) {
    const ChildResult result = Run(Here(), "1", "1", {"log", "1", "both"});
    EXPECT_THAT(result.out, StartsWith("\n"));
    EXPECT_THAT(result.out, EndsWith("\n\nboth\n"));
    EXPECT_EQ(result.out, Log());
}

TEST_F(ParseLog, TextThatCannotBeEncodedDoesNotEndTheLog) {
    const ChildResult result = Run(Here(), "1", "1", {"odd"});
    EXPECT_THAT(Log(), EndsWith("odd \xc3\xa4\xf0\x9f\x8c\x8d\nworse ?\nbeyond ???\nplain\n"));
    EXPECT_THAT(result.out, EndsWith("odd ??\nworse ?\nbeyond ???\nplain\n"));
}

TEST_F(ParseLog, LongTextIsCutAndNotLost) {
    Run(Here(), "1", "0", {"long", "4095"});
    EXPECT_THAT(Log(), EndsWith("\n\n" + std::string(4095, 'x') + "\nplain\n"));
    Run(Here(), "1", "0", {"long", "4096"});
    EXPECT_THAT(Log(), EndsWith("\n\n" + std::string(4095, 'x') + "\nplain\n"));
    Run(Here(), "1", "0", {"long", "20000"});
    EXPECT_THAT(Log(), EndsWith("\n\n" + std::string(4095, 'x') + "\nplain\n"));
}

TEST_F(ParseLog, LinesOfTwoThreadsStayWhole) {
    Run(Here(), "1", "0", {"threads", "3000"});
    std::istringstream lines(Log());
    std::string line;
    for (int i = 0; i < 3; ++i) std::getline(lines, line);
    const auto whole = MatchesRegex("thread [01] line [0-9]+ and no more");
    int count = 0;
    for (; std::getline(lines, line); ++count) ASSERT_THAT(line, whole) << "line " << count;
    EXPECT_EQ(count, 6000);
}

TEST_F(ParseLog, RacingFirstMetadataMakeOneLog) {
    const ChildResult result = Run(Here(), "1", "0", {"race"});
    EXPECT_THAT(result.err, Not(HasSubstr("another log")));
    const std::string log = Log();
    EXPECT_EQ(log.find(kHeaderText), log.rfind(kHeaderText));
    EXPECT_NE(log.find(kHeaderText), log.npos);
}

}  // namespace
