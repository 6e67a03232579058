// What the process services ask of the operating system.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdint>
#include <limits>
#include <string>

#include "platform/DebugOutput.h"
#include "platform/Directory.h"
#include "platform/LoadableLibrary.h"
#include "platform/LocalTime.h"
#include "platform/Random.h"
#include "platform/TextConversion.h"
#include "platform/TextStream.h"
#include "tests/support/ScratchDirectory.h"

namespace platform {
namespace {

using zmctest::ScratchDirectory;

std::u16string Wide(const std::string& text) { return {text.begin(), text.end()}; }

TEST(Directory, MakesOneComponentOnly) {
    const ScratchDirectory scratch;
    EXPECT_FALSE(MakeDirectory((scratch / "a/b").c_str()));
    EXPECT_TRUE(MakeDirectory((scratch / "a").c_str()));
    EXPECT_FALSE(MakeDirectory((scratch / "a").c_str()));
    EXPECT_TRUE(PathExists((scratch / "a").c_str()));
    EXPECT_FALSE(PathExists((scratch / "b").c_str()));
    EXPECT_FALSE(PathExists(nullptr));
    EXPECT_FALSE(MakeDirectory(nullptr));
}

TEST(TextStream, OpensByWideNameAndIsNotInherited) {
    const ScratchDirectory scratch;
    const std::u16string name = Wide(scratch.String()) + u"/\u00e4\U0001F30D";
    std::FILE* const stream = OpenTextStream(name.c_str(), "w");
    ASSERT_NE(stream, nullptr);
    std::fputs("text", stream);
    std::uint64_t position = 0;
    EXPECT_TRUE(SeekToEnd(stream, position));
    EXPECT_EQ(position, 4u);
    EXPECT_EQ(zmctest::ReadText(scratch / "\xc3\xa4\xf0\x9f\x8c\x8d"), "text");
    const std::string link = "/proc/self/fdinfo/" + std::to_string(fileno(stream));
    // 02000000 is the flag that closes the descriptor when another program starts.
    EXPECT_THAT(zmctest::ReadText(link), testing::ContainsRegex("flags:[[:space:]]*02"));
    std::fclose(stream);
}

TEST(TextStream, RefusesWhatCannotBeOpened) {
    EXPECT_EQ(OpenTextStream(nullptr, "r"), nullptr);
    EXPECT_EQ(OpenTextStream(u"/nowhere/at/all", "w"), nullptr);
    EXPECT_EQ(OpenTextStream(u"/", "w"), nullptr);
}

TEST(TextStream, MeasuringAFullDiskFails) {
    std::FILE* const stream = OpenTextStream(u"/dev/full", "w");
    ASSERT_NE(stream, nullptr);
    std::fputs("text", stream);
    std::uint64_t position = 0;
    EXPECT_FALSE(SeekToEnd(stream, position));
    std::fclose(stream);
}

TEST(LoadableLibrary, LoadsFindsUnloads) {
    const std::u16string path = Wide(ZMC_MODULE_PATH);
    const LibraryHandle library = LoadLibraryFile(path.c_str());
    ASSERT_NE(library, nullptr);
    EXPECT_EQ(FindSymbol(library, "NoSuchFunction"), nullptr);
    UnloadLibrary(library);
    EXPECT_EQ(LoadLibraryFile(u"/nowhere/libx.so"), nullptr);
    EXPECT_EQ(LoadLibraryFile(nullptr), nullptr);
}

TEST(LoadableLibrary, RefusesAFileThatIsNoLibrary) {
    const ScratchDirectory scratch;
    zmctest::WriteText(scratch / "libx.so", "not a library");
    EXPECT_EQ(LoadLibraryFile(Wide(scratch / "libx.so").c_str()), nullptr);
}

// Lengths that the conversions cannot count in, refused before a unit is touched.
TEST(TextConversion, LongerTextsAreRefused) {
    constexpr std::size_t most = std::size_t{std::numeric_limits<std::int32_t>::max()};
    char narrow[4];
    char16_t wide[4];
    EXPECT_EQ(Utf8ToUtf16("text", most + 1, wide, 4), kConversionFailed);
    EXPECT_EQ(Utf8ToUtf16("text", 4, wide, most + 1), kConversionFailed);
    EXPECT_EQ(Utf16ToUtf8(u"text", most + 1, narrow, 4), kConversionFailed);
    EXPECT_EQ(Utf16ToUtf8(u"text", 4, narrow, most + 1), kConversionFailed);
    EXPECT_EQ(Utf16ToLocale(u"text", most + 1, narrow, 4), kConversionFailed);
    EXPECT_EQ(Utf16ToLocale(u"text", 4, narrow, most + 1), kConversionFailed);
    EXPECT_EQ(Utf16ToLocale(u"text", 4, narrow, 4), 4u);
}

TEST(TextConversion, LowerCaseOfAUnitIsAUnit) {
    EXPECT_EQ(ToLowerUnit(u'\u00c4'), u'\u00e4');
    EXPECT_EQ(ToLowerUnit(u'\u0130'), u'i');
    EXPECT_EQ(ToLowerUnit(char16_t{0xD801}), char16_t{0xD801});
}

TEST(DebugOutput, LongTextsComeThroughWhole) {
    std::u16string text;
    std::string expected;
    for (int i = 0; i < 1500; ++i) {
        text += u"\u00e4\U0001F30D";
        expected += "\xc3\xa4\xf0\x9f\x8c\x8d";
    }
    testing::internal::CaptureStderr();
    WriteDebugOutput(text.c_str());
    EXPECT_EQ(testing::internal::GetCapturedStderr(), expected);
}

TEST(DebugOutput, UnpairedSurrogatesEndSomewhere) {
    const std::u16string text(3000, u'\xD800');
    testing::internal::CaptureStderr();
    WriteDebugOutput(text.c_str());
    EXPECT_EQ(testing::internal::GetCapturedStderr().size(), 9000u);
}

TEST(Random, FillsAndDoesNotRepeatItself) {
    unsigned char first[40] = {}, second[40] = {};
    ASSERT_TRUE(RandomBytes(first, 32));
    ASSERT_TRUE(RandomBytes(second, 32));
    EXPECT_NE(std::string(first, first + 32), std::string(second, second + 32));
    EXPECT_NE(std::string(first, first + 16), std::string(first + 16, first + 32));
    EXPECT_EQ(std::string(first + 32, first + 40), std::string(8, '\0')) << "and no further";
    EXPECT_TRUE(RandomBytes(nullptr, 0));
}

TEST(LocalTime, HasTwentyFourCharacters) {
    char text[kLocalTimeLength + 1];
    LocalTimeText(text);
    EXPECT_THAT(std::string(text),
                testing::MatchesRegex(
                    "[A-Z][a-z]{2} [A-Z][a-z]{2} [ 0-9][0-9] [0-9]{2}:[0-9]{2}:[0-9]{2} [0-9]{4}"));
}

}  // namespace
}  // namespace platform
